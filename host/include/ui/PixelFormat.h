// Pixel format codes of graphic buffers: the HAL_PIXEL_FORMAT_* values.
#ifndef KIV_HOST_UI_PIXELFORMAT_H
#define KIV_HOST_UI_PIXELFORMAT_H

#include <stdint.h>

#include <system/graphics.h>

namespace android {

typedef int32_t PixelFormat;

enum {
    PIXEL_FORMAT_UNKNOWN = 0,
    PIXEL_FORMAT_NONE = 0,
    PIXEL_FORMAT_RGBA_8888 = HAL_PIXEL_FORMAT_RGBA_8888,
    PIXEL_FORMAT_RGBX_8888 = HAL_PIXEL_FORMAT_RGBX_8888,
    PIXEL_FORMAT_BGRA_8888 = HAL_PIXEL_FORMAT_BGRA_8888,
};

}  // namespace android

// Vendor codes for the semi-planar 4:2:0 layouts that some camera HALs
// allocate instead of HAL_PIXEL_FORMAT_YCrCb_420_SP.
#define HAL_PIXEL_FORMAT_VENDOR_YCbCr_420_SP 0x105  // NV12
#define HAL_PIXEL_FORMAT_VENDOR_YCrCb_420_SP 0x11E  // NV21

#endif
