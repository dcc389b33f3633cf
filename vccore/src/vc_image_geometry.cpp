// Scaling, cropping, right-angle rotation and pasting of image records.
// Scaling and rotation sample like an unfiltered 2D canvas draw: every
// destination pixel centre is mapped back into the source and takes the
// pixel it lands in; centres landing outside stay transparent black.
#include <math.h>
#include <stdlib.h>
#include <string.h>

#include "vc_image_layout.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_geometry.h"
#include "vccore/vc_log.h"

namespace {

const char* fourcc(const uint32_t& format) {
    return reinterpret_cast<const char*>(&format);
}

// True when every plane of the image lies inside the bytes its size field
// declares. Without a size field only the chroma offset tells where the
// chroma lies (bands of a larger frame, padded camera buffers): trusted.
bool planesFit(const VCImage* image) {
    if (image->size == 0) return true;
    const uint64_t luma = static_cast<uint64_t>(image->width) * image->height;
    uint64_t end = VCImage_requiredSize(image->width, image->height, image->format);
    if (VCImage_isYUV420(image->format) && image->uvOffset != 0) {
        const uint64_t chromaEnd = image->uvOffset + luma / 2;
        end = chromaEnd > luma ? chromaEnd : luma;
    }
    return image->size >= end;
}

// Copies `rows` rows of `bytes` bytes between planes of the given strides.
void copyRows(const uint8_t* src, size_t srcStride, uint8_t* dst, size_t dstStride, int rows,
              size_t bytes) {
    for (int i = 0; i < rows; ++i) memcpy(dst + i * dstStride, src + i * srcStride, bytes);
}

inline int floorHalf(int twice) {
    return twice >= 0 ? twice / 2 : -((1 - twice) / 2);
}

// Rotates 4-byte pixels about a pivot; the output buffer is cleared first.
void rotatePixels(const uint8_t* in, int w, int h, int orient, int px, int py, uint8_t* out,
                  int outW, int outH) {
    static const int kCos[4] = {1, 0, -1, 0};
    static const int kSin[4] = {0, 1, 0, -1};
    const int c = kCos[orient];
    const int s = kSin[orient];
    memset(out, 0, static_cast<size_t>(outW) * outH * 4);
    // Doubled coordinates keep the pixel centres integral.
    for (int y = 0; y < outH; ++y) {
        const int dy = 2 * y + 1 - 2 * py;
        for (int x = 0; x < outW; ++x) {
            const int dx = 2 * x + 1 - 2 * px;
            const int sx = floorHalf(c * dx - s * dy + 2 * px);
            const int sy = floorHalf(s * dx + c * dy + 2 * py);
            if (sx < 0 || sx >= w || sy < 0 || sy >= h) continue;
            memcpy(out + (static_cast<size_t>(y) * outW + x) * 4,
                   in + (static_cast<size_t>(sy) * w + sx) * 4, 4);
        }
    }
}

int rotateRgba(VCImage* image, int angle) {
    if (VCImage_size(image) < VCImage_requiredSize(image->width, image->height, VC_FORMAT_RGBA))
        return VC_REPORT(VC_ERROR_INVALID_SIZE);
    const int w = image->width;
    const int h = image->height;
    const int orient = ((angle / 90) % 4 + 4) % 4;
    const bool swap = orient % 2 == 1;
    const int outW = swap ? h : w;
    const int outH = swap ? w : h;
    int px = w / 2, py = h / 2;
    if (orient == 1) {
        px = py = w >= h ? h : w / 2;
    } else if (orient == 3) {
        px = py = w >= h ? h / 2 : w;
    }
    VF_LogMsg(VF_LOG_DEBUG,
              "Rotation parameters: angle = %d, orient = %d, in w/h = %dx%d, out w/h = %dx%d, "
              "pivot = %d,%d",
              angle, orient, w, h, outW, outH, px, py);
    const size_t outBytes = static_cast<size_t>(outW) * outH * 4;
    uint8_t* out = static_cast<uint8_t*>(malloc(outBytes));
    if (out == nullptr) return VC_REPORT(VC_ERROR_ALLOC_FAILED);
    const uint32_t size = VCImage_size(image);
    if (outBytes < size) {
        free(out);
        return VC_REPORT(VC_ERROR_INVALID_SIZE);
    }
    rotatePixels(image->data, w, h, orient, px, py, out, outW, outH);
    image->width = outW;
    image->height = outH;
    memcpy(image->data, out, VCImage_size(image));
    free(out);
    return VC_OK;
}

}  // namespace

extern "C" int VCImage_scale(const VCImage* source, VCImage* destination) {
    if (source == nullptr || destination == nullptr || source->data == nullptr)
        return VC_REPORT(VC_ERROR_NULL_PARAM);
    if (source->width < 1 || source->height < 1 || destination->width < 1 ||
        destination->height < 1) {
        VF_LogMsg(VF_LOG_ERROR, "%s: invalid image dimensions (<=0)", "VCImage_scale");
        return VC_REPORT(VC_ERROR_INVALID_SIZE);
    }
    if (source->format != VC_FORMAT_RGBA || destination->format != VC_FORMAT_RGBA) {
        VF_LogMsg(VF_LOG_ERROR, "%s supports only ANDROID_BITMAP format for now", "VCImage_scale");
        return VC_REPORT(VC_ERROR_INVALID_PARAM);
    }
    if (destination->data == nullptr) {
        const int result = VCImage_allocate(destination);
        if (result < 0) {
            VF_LogMsg(VF_LOG_ERROR, "%s: allocation failed (%d bytes)", "VCImage_scale",
                      static_cast<int>(VCImage_size(destination)));
            return result;
        }
    }
    if (!planesFit(source) || !planesFit(destination)) return VC_REPORT(VC_ERROR_INVALID_SIZE);

    return VCImage_scalePlane(source->data, source->width, source->height, destination->data,
                              destination->width, destination->height, 4);
}

extern "C" int VCImage_scalePlane(const uint8_t* source, int sw, int sh, uint8_t* destination,
                                  int dw, int dh, int bytesPerSample) {
    if (source == nullptr || destination == nullptr) return VC_REPORT(VC_ERROR_NULL_PARAM);
    if (sw < 1 || sh < 1 || dw < 1 || dh < 1 || bytesPerSample < 1)
        return VC_REPORT(VC_ERROR_INVALID_SIZE);
    const size_t step = static_cast<size_t>(bytesPerSample);
    // The canvas scale factors are single-precision quotients.
    const float scaleX = static_cast<float>(dw) / static_cast<float>(sw);
    const float scaleY = static_cast<float>(dh) / static_cast<float>(sh);
    int* columns = static_cast<int*>(malloc(sizeof(int) * dw));
    if (columns == nullptr) return VC_REPORT(VC_ERROR_ALLOC_FAILED);
    for (int x = 0; x < dw; ++x) {
        const double sx = floor((x + 0.5) / static_cast<double>(scaleX));
        columns[x] = sx < sw ? static_cast<int>(sx) : -1;
    }
    for (int y = 0; y < dh; ++y) {
        const double syf = floor((y + 0.5) / static_cast<double>(scaleY));
        uint8_t* row = destination + static_cast<size_t>(y) * dw * step;
        if (syf >= sh) {
            memset(row, 0, static_cast<size_t>(dw) * step);
            continue;
        }
        const uint8_t* srcRow = source + static_cast<size_t>(syf) * sw * step;
        for (int x = 0; x < dw; ++x) {
            if (columns[x] < 0)
                memset(row + x * step, 0, step);
            else
                memcpy(row + x * step, srcRow + static_cast<size_t>(columns[x]) * step, step);
        }
    }
    free(columns);
    return VC_OK;
}

extern "C" int VCImage_crop(const VCImage* source, VCImage* destination, int x, int y) {
    if (source == nullptr || destination == nullptr || source->data == nullptr)
        return VC_REPORT(VC_ERROR_NULL_PARAM);
    if (VCImage_size(source) == 0) return VC_REPORT(VC_ERROR_INVALID_SIZE);
    if (source->format != destination->format) return VC_REPORT(VC_ERROR_INVALID_PARAM);
    if (x < 0 || static_cast<int64_t>(x) + destination->width > source->width)
        return VC_REPORT(VC_ERROR_INVALID_SIZE);
    if (y < 0 || static_cast<int64_t>(y) + destination->height > source->height)
        return VC_REPORT(VC_ERROR_INVALID_SIZE);
    const int allocated = VCImage_allocate(destination);
    if (allocated < 0) return allocated;
    if (!planesFit(source) || !planesFit(destination)) return VC_REPORT(VC_ERROR_INVALID_SIZE);

    const int sw = source->width, dw = destination->width, dh = destination->height;
    VCRgbLayout rgb;
    if (VCImage_rgbLayout(source->format, &rgb)) {
        const size_t bpp = static_cast<size_t>(rgb.bytesPerPixel);
        copyRows(source->data + (static_cast<size_t>(y) * sw + x) * bpp, sw * bpp,
                 destination->data, dw * bpp, dh, dw * bpp);
        return VC_OK;
    }
    if (!VCImage_isYUV420(source->format)) return VC_REPORT(VC_ERROR_UNSUPPORTED);
    if (x % 2 != 0 || y % 2 != 0) return VC_REPORT(VC_ERROR_INVALID_SIZE);
    if (sw % 2 != 0 || source->height % 2 != 0) return VC_REPORT(VC_ERROR_INVALID_SIZE);
    if (dw % 2 != 0 || dh % 2 != 0) return VC_REPORT(VC_ERROR_INVALID_SIZE);
    VCYuvLayout sl, dl;
    if (!VCImage_yuvLayout(source, &sl) || !VCImage_yuvLayout(destination, &dl) ||
        sl.lumaStep != 1 || dl.lumaStep != 1)
        return VC_REPORT(VC_ERROR_UNKNOWN);

    copyRows(source->data + static_cast<size_t>(y) * sw + x, sw, destination->data, dw, dh, dw);
    if (sl.chromaStep == 2) {
        const size_t srcPlane = sl.uOffset < sl.vOffset ? sl.uOffset : sl.vOffset;
        const size_t dstPlane = dl.uOffset < dl.vOffset ? dl.uOffset : dl.vOffset;
        copyRows(source->data + srcPlane + static_cast<size_t>(y / 2) * sw + x, sw,
                 destination->data + dstPlane, dw, dh / 2, dw);
    } else {
        const size_t from = static_cast<size_t>(y / 2) * (sw / 2) + x / 2;
        copyRows(source->data + sl.uOffset + from, sw / 2, destination->data + dl.uOffset, dw / 2,
                 dh / 2, dw / 2);
        copyRows(source->data + sl.vOffset + from, sw / 2, destination->data + dl.vOffset, dw / 2,
                 dh / 2, dw / 2);
    }
    return VC_OK;
}

extern "C" int VCImage_rotate(VCImage* image, int angle) {
    if (image == nullptr || image->data == nullptr) return VC_REPORT(VC_ERROR_NULL_PARAM);
    if (angle % 90 != 0) return VC_REPORT(VC_ERROR_INVALID_PARAM);
    if (VCImage_size(image) == 0) return VC_REPORT(VC_ERROR_INVALID_SIZE);
    if (image->format == VC_FORMAT_RGBA) return rotateRgba(image, angle);

    VF_LogMsg(VF_LOG_WARNING,
              "Rotation is supported on RGBA images only for now: using temporary RGBA copy of "
              "this %dx%d '%4.4s' image",
              image->width, image->height, fourcc(image->format));
    VCImage* rgba = VCImage_createNew(image->width, image->height, VC_FORMAT_RGBA);
    if (rgba == nullptr) return VC_REPORT(VC_ERROR_ALLOC_FAILED);
    const int result = VCImage_convert(image, rgba);
    if (result == VC_OK) {
        // Only the first conversion decides the result: a failed rotation or
        // conversion back has been logged where it happened and is not returned.
        rotateRgba(rgba, angle);
        VCImage_convert(rgba, image);
    }
    VCImage_destroy(rgba);
    return result;
}

extern "C" int VCImage_drawImage(const VCImage* source, VCImage* destination, int x, int y) {
    if (source == nullptr || destination == nullptr || source->data == nullptr ||
        destination->data == nullptr)
        return VC_REPORT(VC_ERROR_NULL_PARAM);
    if (VCImage_size(source) == 0) return VC_REPORT(VC_ERROR_INVALID_SIZE);
    if (source->format != destination->format) return VC_REPORT(VC_ERROR_INVALID_PARAM);
    const int sw = source->width, sh = source->height;
    const int dw = destination->width, dh = destination->height;
    if (x >= dw || y >= dh || static_cast<int64_t>(x) + sw < 0 ||
        static_cast<int64_t>(y) + sh < 0) {
        VF_LogMsg(VF_LOG_WARNING,
                  "In %s, the source image %dx%d is completely out of the destination %dx%d at "
                  "%d,%d",
                  "VCImage_drawImage", sw, sh, dw, dh, x, y);
        return VC_OK;
    }
    int lines = sh;
    if (y < 0) lines -= -y;
    if (y + sh - dh > 0) lines -= y + sh - dh;
    int cols = sw;
    if (x < 0) cols -= -x;
    if (x + sw - dw > 0) cols -= x + sw - dw;
    if (lines < 1 || cols < 1) {
        VF_LogMsg(VF_LOG_WARNING, "Nothing to draw (lines = %d, cols = %d)", lines, cols);
        return VC_OK;
    }
    if (!planesFit(source) || !planesFit(destination)) return VC_REPORT(VC_ERROR_INVALID_SIZE);

    // A negative offset hides the source's leading rows and columns: the
    // part that stays visible is the part that lies inside the destination.
    const int srcX = x < 0 ? -x : 0;
    const int srcY = y < 0 ? -y : 0;
    const int dstX = x < 0 ? 0 : x;
    const int dstY = y < 0 ? 0 : y;
    VCRgbLayout rgb;
    if (VCImage_rgbLayout(source->format, &rgb)) {
        const size_t bpp = static_cast<size_t>(rgb.bytesPerPixel);
        copyRows(source->data + (static_cast<size_t>(srcY) * sw + srcX) * bpp, sw * bpp,
                 destination->data + (static_cast<size_t>(dstY) * dw + dstX) * bpp, dw * bpp, lines,
                 cols * bpp);
        return VC_OK;
    }
    if (!VCImage_isYUV420(source->format)) return VC_REPORT(VC_ERROR_UNSUPPORTED);
    if (x % 2 != 0 || y % 2 != 0 || sw % 2 != 0 || sh % 2 != 0) {
        VF_LogMsg(VF_LOG_ERROR, "Unsupported dimensions for YUV420: %dx%d offset %d,%d", sw, sh, x,
                  y);
        return VC_REPORT(VC_ERROR_UNSUPPORTED);
    }
    VCYuvLayout sl, dl;
    if (!VCImage_yuvLayout(source, &sl) || !VCImage_yuvLayout(destination, &dl))
        return VC_REPORT(VC_ERROR_UNKNOWN);
    copyRows(source->data + static_cast<size_t>(srcY) * sw + srcX, sw,
             destination->data + static_cast<size_t>(dstY) * dw + dstX, dw, lines, cols);
    if (sl.chromaStep == 2) {
        const size_t srcPlane = sl.uOffset < sl.vOffset ? sl.uOffset : sl.vOffset;
        const size_t dstPlane = dl.uOffset < dl.vOffset ? dl.uOffset : dl.vOffset;
        copyRows(source->data + srcPlane + static_cast<size_t>(srcY / 2) * sw + srcX, sw,
                 destination->data + dstPlane + static_cast<size_t>(dstY / 2) * dw + dstX, dw,
                 lines / 2, cols);
    } else {
        const size_t from = static_cast<size_t>(srcY / 2) * (sw / 2) + srcX / 2;
        const size_t to = static_cast<size_t>(dstY / 2) * (dw / 2) + dstX / 2;
        copyRows(source->data + sl.uOffset + from, sw / 2, destination->data + dl.uOffset + to,
                 dw / 2, lines / 2, cols / 2);
        copyRows(source->data + sl.vOffset + from, sw / 2, destination->data + dl.vOffset + to,
                 dw / 2, lines / 2, cols / 2);
    }
    return VC_OK;
}
