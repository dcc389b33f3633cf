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
// source's and its format selects the target.
int VCImage_convert(const VCImage* source, VCImage* destination);

// A new owning image of the source's size in `format`, or null.
VCImage* VCImage_copyAndConvert(const VCImage* source, uint32_t format);

typedef struct VCConverter VCConverter;

VCConverter* VCConverter_create(int width, int height, uint32_t sourceFormat,
                                uint32_t destinationFormat);
int VCConverter_convert(VCConverter* converter, const VCImage* source, VCImage* destination);
void VCConverter_release(VCConverter* converter);

#ifdef __cplusplus
}
#endif

#endif
