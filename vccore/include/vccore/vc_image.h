// The image record of the image core: one FourCC-tagged description of a
// tightly packed pixel buffer, owned or wrapped.
#ifndef VCCORE_VC_IMAGE_H
#define VCCORE_VC_IMAGE_H

#include <stdint.h>

#include "vccore/vc_error.h"

// FourCC values keep their first character in the lowest byte.
#define VC_FOURCC(a, b, c, d)                                                                  \
    ((uint32_t)(uint8_t)(a) | ((uint32_t)(uint8_t)(b) << 8) | ((uint32_t)(uint8_t)(c) << 16) | \
     ((uint32_t)(uint8_t)(d) << 24))

#define VC_FORMAT_RGBA VC_FOURCC('R', 'G', 'B', 'A')
#define VC_FORMAT_BGRA VC_FOURCC('B', 'G', 'R', 'A')
#define VC_FORMAT_ARGB VC_FOURCC('A', 'R', 'G', 'B')
#define VC_FORMAT_ABGR VC_FOURCC('A', 'B', 'G', 'R')
#define VC_FORMAT_RGB8 VC_FOURCC('R', 'G', 'B', '8')
#define VC_FORMAT_BGR8 VC_FOURCC('B', 'G', 'R', '8')
#define VC_FORMAT_GREY VC_FOURCC('G', 'R', 'E', 'Y')
#define VC_FORMAT_YUYV VC_FOURCC('Y', 'U', 'Y', 'V')
#define VC_FORMAT_YVYU VC_FOURCC('Y', 'V', 'Y', 'U')
#define VC_FORMAT_NV12 VC_FOURCC('N', 'V', '1', '2')
#define VC_FORMAT_NV21 VC_FOURCC('N', 'V', '2', '1')
#define VC_FORMAT_YV12 VC_FOURCC('Y', 'V', '1', '2')
#define VC_FORMAT_YUVP VC_FOURCC('Y', 'U', 'V', 'P')
// An encoded JPEG stream: no family, no required size; `size` is its length.
#define VC_FORMAT_JPEG VC_FOURCC('J', 'P', 'E', 'G')

#ifdef __cplusplus
// Polymorphic only through its destructor, which releases the buffer as
// VCImage_deallocate does.
class VCImage {
public:
    VCImage() = default;
    virtual ~VCImage();

    unsigned char* data = nullptr;
    int32_t width = 0;
    int32_t height = 0;
    uint32_t format = 0;
    int32_t wrapped = 0;    // 1: data belongs to the caller, never freed here
    uint32_t size = 0;      // bytes behind data; 0: compute from geometry
    uint32_t uvOffset = 0;  // 4:2:0 chroma offset from data; 0: width*height

    VCImage(const VCImage&) = delete;
    VCImage& operator=(const VCImage&) = delete;
};
extern "C" {
#else
typedef struct VCImage VCImage;
#endif

// Format families. Grey counts as YUV.
int VCImage_isRGB(uint32_t format);
int VCImage_isYUV(uint32_t format);
int VCImage_isYUV420(uint32_t format);

// Bytes for a width×height image of a format; 0 for sizes below 1, unknown
// formats, and byte counts that do not fit in 32 bits. 4:2:0 sizes are
// (3·w·h + 1) / 2: half the sum, not per-plane rounding.
uint32_t VCImage_requiredSize(int width, int height, uint32_t format);

// The size field when non-zero, else the required size; 0 for null.
uint32_t VCImage_size(const VCImage* image);

VCImage* VCImage_createEmpty(int width, int height, uint32_t format);
VCImage* VCImage_createNew(int width, int height, uint32_t format);
VCImage* VCImage_createWrap(unsigned char* data, int width, int height, uint32_t format, int size,
                            uint32_t uvOffset);

// Byte counts are returned as int: a buffer larger than INT_MAX bytes is
// refused with VC_ERROR_INVALID_SIZE rather than returned as a negative count.
int VCImage_allocate(VCImage* image);
int VCImage_wrap(VCImage* image, unsigned char* data, int size, uint32_t uvOffset);
void VCImage_deallocate(VCImage* image);
void VCImage_reset(VCImage* image);

VCImage* VCImage_clone(const VCImage* image);
VCImage* VCImage_cloneHeader(const VCImage* image);
void VCImage_destroy(VCImage* image);

#ifdef __cplusplus
}
#endif

#endif
