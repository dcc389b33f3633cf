// The one table between graphic-buffer pixel formats (HAL codes) and the
// image core's FourCCs. The library allocates each of its formats with the
// first code listed for it and locks only buffers of its own codes; a host
// allocator also holds the host-only layouts at the end.
#ifndef CORE_EGL_HALPIXELFORMAT_H
#define CORE_EGL_HALPIXELFORMAT_H

#include <stdint.h>

#include <system/graphics.h>

#include "vccore/vc_image.h"

// Vendor codes for the semi-planar 4:2:0 layouts that some camera HALs
// allocate instead of HAL_PIXEL_FORMAT_YCrCb_420_SP.
#define HAL_PIXEL_FORMAT_VENDOR_YCbCr_420_SP 0x105  // NV12
#define HAL_PIXEL_FORMAT_VENDOR_YCrCb_420_SP 0x11E  // NV21

struct HalPixelFormat {
    int code;
    uint32_t fourcc;
    bool library;  // one of the library's own codes (the rest are host-only)

    // The FourCC of a code, 0 when the table (or its library part) lacks it.
    static uint32_t fourccOf(int code, bool libraryOnly);
    // The code the library allocates a FourCC with, 0 when it has none.
    static int codeOf(uint32_t fourcc);
};

inline constexpr HalPixelFormat kHalPixelFormats[] = {
    {HAL_PIXEL_FORMAT_RGBA_8888, VC_FORMAT_RGBA, true},
    {HAL_PIXEL_FORMAT_YCrCb_420_SP, VC_FORMAT_NV21, true},
    {HAL_PIXEL_FORMAT_VENDOR_YCrCb_420_SP, VC_FORMAT_NV21, true},
    {HAL_PIXEL_FORMAT_VENDOR_YCbCr_420_SP, VC_FORMAT_NV12, true},
    {HAL_PIXEL_FORMAT_YV12, VC_FORMAT_YV12, true},
    // Host-only: RGBA memory without alpha, BGRA, and the layout a host
    // allocator picks when the format is left to it.
    {HAL_PIXEL_FORMAT_RGBX_8888, VC_FORMAT_RGBA, false},
    {HAL_PIXEL_FORMAT_BGRA_8888, VC_FORMAT_BGRA, false},
    {HAL_PIXEL_FORMAT_IMPLEMENTATION_DEFINED, VC_FORMAT_RGBA, false},
};

inline uint32_t HalPixelFormat::fourccOf(int code, bool libraryOnly) {
    for (const HalPixelFormat& f : kHalPixelFormats) {
        if (f.code == code && (f.library || !libraryOnly)) return f.fourcc;
    }
    return 0;
}

inline int HalPixelFormat::codeOf(uint32_t fourcc) {
    for (const HalPixelFormat& f : kHalPixelFormats) {
        if (f.fourcc == fourcc && f.library) return f.code;
    }
    return 0;
}

#endif
