// The external colour-conversion fast path of VCImage_convert.
#ifndef VCCORE_VC_CSC_H
#define VCCORE_VC_CSC_H

#include "vccore/vc_image.h"

#ifdef __cplusplus
extern "C" {
#endif

// Converts through the optional "libcsc.so" when it offers the pair ("BGRA" to
// "NV12" only). VC_ERROR_UNSUPPORTED, silently, for any other pair; logged when
// the library or its entries are missing.
int csc_run(const VCImage* source, VCImage* destination);

#ifdef __cplusplus
}
#endif

#endif
