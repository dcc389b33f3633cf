// Layout descriptors that every per-pixel loop of the image core walks.
#ifndef VCCORE_VC_IMAGE_LAYOUT_H
#define VCCORE_VC_IMAGE_LAYOUT_H

#include <stdint.h>

#include "vccore/vc_image.h"

// Every vc_image_*.cpp file reports its errors under this one source name.
#define VC_SOURCE "vccore/src/vc_image"

// Bytes per pixel and the byte index of each channel; a = -1 without alpha.
struct VCRgbLayout {
    int bytesPerPixel;
    int r;
    int g;
    int b;
    int a;
};

// Byte offsets of the first U and V samples from data, and the steps between
// successive luma and chroma samples.
struct VCYuvLayout {
    uint32_t uOffset;
    uint32_t vOffset;
    int lumaStep;
    int chromaStep;
};

// Whether an image of `format` can have this geometry: 4:2:2 and 4:2:0
// formats need even widths, 4:2:0 even heights; grey is free.
static inline bool VCImage_parityOk(uint32_t format, int width, int height) {
    if (!VCImage_isYUV(format) || format == VC_FORMAT_GREY) return true;
    if (width % 2 != 0) return false;
    return !VCImage_isYUV420(format) || height % 2 == 0;
}

// False for formats outside the RGB family.
bool VCImage_rgbLayout(uint32_t format, VCRgbLayout* layout);

// False for a null image or a format outside the YUV family. 4:2:0 offsets
// honour the image's uvOffset.
bool VCImage_yuvLayout(const VCImage* image, VCYuvLayout* layout);

#endif
