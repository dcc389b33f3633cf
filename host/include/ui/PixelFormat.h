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

#endif
