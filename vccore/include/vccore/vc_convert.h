// Colour conversion between the FourCC formats of the image record, and the
// handle around the optional external conversion library.
#ifndef VCCORE_VC_CONVERT_H
#define VCCORE_VC_CONVERT_H

#include <stdint.h>

#include "vccore/vc_image.h"

#ifdef __cplusplus
extern "C" {
#endif

// The destination must already have a buffer; its width and height become the
// source's and its format selects the target. Full-range (JPEG) YUV on both
// sides; chroma is point-sampled (not averaged) when subsampling, and grey
// sources convert to neutral RGB (R = G = B = Y). Returns 0 or a VC_ERROR_*
// code: VC_ERROR_INVALID_SIZE for odd 4:2:x sizes (of each image's own
// geometry: an existing even destination may take an odd one) or a
// destination (or source) buffer too small, VC_ERROR_UNSUPPORTED for pairs
// outside the formats. A chroma offset is bounded by a size field that is set
// and trusted without one.
int VCImage_convert(const VCImage* source, VCImage* destination);

// A new owning image of the source's size in `format`, or null.
VCImage* VCImage_copyAndConvert(const VCImage* source, uint32_t format);

// Handle around the optional "libvccore_csc.so". Null when the library, one of
// its entries, or a converter for this geometry is missing; once the library
// or an entry has been found missing, no later call tries again.
typedef struct VCConverter VCConverter;

VCConverter* VCConverter_create(int width, int height, uint32_t sourceFormat,
                                uint32_t destinationFormat);
int VCConverter_convert(VCConverter* converter, const VCImage* source, VCImage* destination);
void VCConverter_release(VCConverter* converter);

#ifdef __cplusplus
}
#endif

#endif
