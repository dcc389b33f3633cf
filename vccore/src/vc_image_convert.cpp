// Colour conversion between the FourCC formats of the image record. The plain
// per-pixel loops here are the reference; vector paths (vc_image_convert_fast and its
// per-instruction-set kernels) must reproduce them bit for bit.
#include <string.h>

#include "vc_csc.h"
#include "vc_image_convert_fast.h"
#include "vc_image_layout.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_log.h"

namespace {

const char* fourcc(const uint32_t& format) {
    return reinterpret_cast<const char*>(&format);
}

// End of the bytes the planes of an image reach, for images whose chroma plane
// may be displaced behind a caller-chosen offset (before or after the luma end).
uint64_t planesEnd(const VCImage* image) {
    const uint64_t luma = static_cast<uint64_t>(image->width) * image->height;
    if (VCImage_isYUV420(image->format) && image->uvOffset != 0) {
        const uint64_t chromaEnd = image->uvOffset + luma / 2;
        return chromaEnd > luma ? chromaEnd : luma;
    }
    return VCImage_requiredSize(image->width, image->height, image->format);
}

void copySameFormat(const VCImage* src, VCImage* dst, uint32_t bytes) {
    if (VCImage_isYUV420(src->format) && src->uvOffset != dst->uvOffset) {
        const size_t luma = static_cast<size_t>(src->width) * src->height;
        const size_t srcChroma = src->uvOffset != 0 ? src->uvOffset : luma;
        const size_t dstChroma = dst->uvOffset != 0 ? dst->uvOffset : luma;
        memcpy(dst->data, src->data, luma);
        memcpy(dst->data + dstChroma, src->data + srcChroma, luma / 2);
        return;
    }
    memcpy(dst->data, src->data, bytes);
}

// Chroma sample index of pixel (x, y).
inline size_t chromaIndex(bool is420, int width, int x, int y) {
    const size_t half = static_cast<size_t>(width / 2);
    return (is420 ? static_cast<size_t>(y / 2) : static_cast<size_t>(y)) * half +
           static_cast<size_t>(x / 2);
}

int yuvToYuv(const VCImage* src, VCImage* dst) {
    VCYuvLayout sl, dl;
    if (!VCImage_yuvLayout(src, &sl) || !VCImage_yuvLayout(dst, &dl))
        return VC_REPORT(VC_ERROR_UNKNOWN);
    const int w = src->width;
    const int h = src->height;
    const size_t pixels = static_cast<size_t>(w) * h;
    const uint8_t* s = src->data;
    uint8_t* d = dst->data;
    if (sl.lumaStep == 1 && dl.lumaStep == 1) {
        memcpy(d, s, pixels);
    } else {
        for (size_t i = 0; i < pixels; ++i) d[i * dl.lumaStep] = s[i * sl.lumaStep];
    }
    if (dl.chromaStep == 0) return VC_OK;

    const bool src420 = VCImage_isYUV420(src->format) != 0;
    const bool dst420 = VCImage_isYUV420(dst->format) != 0;
    if (sl.chromaStep == 0) {
        // Grey has no chroma: a neutral-ish fill over the count the chroma
        // of a single plane would take, from the lower chroma address.
        const size_t start = dl.uOffset < dl.vOffset ? dl.uOffset : dl.vOffset;
        memset(d + start, 127, dst420 ? pixels / 4 : pixels / 2);
        return VC_OK;
    }
    const size_t half = static_cast<size_t>(w / 2);
    auto copyPair = [&](size_t to, size_t from) {
        d[dl.uOffset + to * dl.chromaStep] = s[sl.uOffset + from * sl.chromaStep];
        d[dl.vOffset + to * dl.chromaStep] = s[sl.vOffset + from * sl.chromaStep];
    };
    if (src420 == dst420) {
        const size_t pairs = dst420 ? pixels / 4 : pixels / 2;
        for (size_t i = 0; i < pairs; ++i) copyPair(i, i);
    } else if (src420) {
        // Each source chroma row serves two destination rows.
        for (int y = 0; y < h; ++y)
            for (size_t j = 0; j < half; ++j) copyPair(y * half + j, (y / 2) * half + j);
    } else {
        // The first row of every pair gives the chroma; the second is skipped.
        for (int y = 0; y < h / 2; ++y)
            for (size_t j = 0; j < half; ++j) copyPair(y * half + j, (2 * y) * half + j);
    }
    return VC_OK;
}

int yuvToRgb(const VCImage* src, VCImage* dst) {
    VCYuvLayout sl;
    VCRgbLayout dl;
    if (!VCImage_yuvLayout(src, &sl) || !VCImage_rgbLayout(dst->format, &dl))
        return VC_REPORT(VC_ERROR_UNKNOWN);
    const int w = src->width;
    const int h = src->height;
    const bool is420 = VCImage_isYUV420(src->format) != 0;
    const uint8_t* s = src->data;
    for (int y = 0; y < h; ++y) {
        uint8_t* row = dst->data + static_cast<size_t>(y) * w * dl.bytesPerPixel;
        for (int x = 0; x < w; x += 2) {
            // Grey has no chroma (chroma step 0; its offsets point at luma,
            // not at chroma samples): its pixels are neutral.
            int u = 128;
            int v = 128;
            if (sl.chromaStep != 0) {
                const size_t c = chromaIndex(is420, w, x, y) * sl.chromaStep;
                u = s[sl.uOffset + c];
                v = s[sl.vOffset + c];
            }
            const int count = x + 1 < w ? 2 : 1;
            for (int k = 0; k < count; ++k) {
                const size_t i = static_cast<size_t>(y) * w + x + k;
                uint8_t* px = row + static_cast<size_t>(x + k) * dl.bytesPerPixel;
                VCConvert_yuvToRgb(s[i * sl.lumaStep], u, v, px + dl.r, px + dl.g, px + dl.b);
                if (dl.a >= 0) px[dl.a] = 255;
            }
        }
    }
    return VC_OK;
}

int rgbToYuv(const VCImage* src, VCImage* dst) {
    VCRgbLayout sl;
    VCYuvLayout dl;
    if (!VCImage_rgbLayout(src->format, &sl) || !VCImage_yuvLayout(dst, &dl))
        return VC_REPORT(VC_ERROR_UNKNOWN);
    const int w = src->width;
    const int h = src->height;
    const bool is420 = VCImage_isYUV420(dst->format) != 0;
    uint8_t* d = dst->data;
    // A target of odd size (an existing even image taking an odd geometry)
    // has (w/2)·(h/2) chroma samples: a last odd column or row has none of
    // its own and gives no chroma, which keeps every write inside the
    // (3·w·h + 1) / 2 bytes of a 4:2:0 image.
    for (int y = 0; y < h; ++y) {
        const uint8_t* row = src->data + static_cast<size_t>(y) * w * sl.bytesPerPixel;
        const bool chromaRow = dl.chromaStep != 0 && (!is420 || (y % 2 == 0 && y + 1 < h));
        for (int x = 0; x < w; ++x) {
            const uint8_t* px = row + static_cast<size_t>(x) * sl.bytesPerPixel;
            const int r = px[sl.r];
            const int g = px[sl.g];
            const int b = px[sl.b];
            const uint8_t luma = VCConvert_rgbToY(r, g, b);
            d[(static_cast<size_t>(y) * w + x) * dl.lumaStep] = luma;
            if (chromaRow && x % 2 == 0 && x + 1 < w) {
                // Point-sampled: the first pixel of the pair gives the chroma.
                const size_t c = chromaIndex(is420, w, x, y) * dl.chromaStep;
                d[dl.uOffset + c] = VCConvert_rgbToU(b, luma);
                d[dl.vOffset + c] = VCConvert_rgbToV(r, luma);
            }
        }
    }
    return VC_OK;
}

int rgbToRgb(const VCImage* src, VCImage* dst) {
    VCRgbLayout sl, dl;
    if (!VCImage_rgbLayout(src->format, &sl) || !VCImage_rgbLayout(dst->format, &dl))
        return VC_REPORT(VC_ERROR_UNKNOWN);
    const size_t pixels = static_cast<size_t>(src->width) * src->height;
    const uint8_t* s = src->data;
    uint8_t* d = dst->data;
    for (size_t i = 0; i < pixels; ++i, s += sl.bytesPerPixel, d += dl.bytesPerPixel) {
        const uint8_t r = s[sl.r];
        const uint8_t g = s[sl.g];
        const uint8_t b = s[sl.b];
        d[dl.r] = r;
        d[dl.g] = g;
        d[dl.b] = b;
        if (dl.a >= 0) d[dl.a] = sl.a >= 0 ? s[sl.a] : 255;
    }
    return VC_OK;
}

}  // namespace

extern "C" int VCImage_convert(const VCImage* source, VCImage* destination) {
    if (source == nullptr || destination == nullptr) return VC_REPORT(VC_ERROR_NULL_PARAM);
    VF_LogMsg(VF_LOG_DEBUG, "[VCImage] Converting from %dx%d %4.4s to %dx%d %4.4s", source->width,
              source->height, fourcc(source->format), destination->width, destination->height,
              fourcc(destination->format));
    if (source->data == nullptr || destination->data == nullptr)
        return VC_REPORT(VC_ERROR_INVALID_PARAM);
    const uint32_t required =
        VCImage_requiredSize(source->width, source->height, destination->format);
    if (required == 0) return VC_REPORT(VC_ERROR_INVALID_PARAM);

    // The destination is checked with its own geometry as it stands.
    if (!VCImage_parityOk(source->format, source->width, source->height) ||
        !VCImage_parityOk(destination->format, destination->width, destination->height))
        return VC_REPORT(VC_ERROR_INVALID_SIZE);

    uint32_t copyBytes = required;
    if (destination->size != 0) {
        if (destination->size < required) return VC_REPORT(VC_ERROR_INVALID_SIZE);
        if (destination->size == source->size) copyBytes = destination->size;
    } else if (VCImage_size(destination) < required) {
        return VC_REPORT(VC_ERROR_INVALID_SIZE);
    }
    // A buffer with a size field is never read or written past it, whatever
    // its chroma offset says. Without one only the offset tells where the
    // chroma lies (bands of a larger frame, padded camera buffers): trusted.
    if (source->size != 0 && source->size < planesEnd(source))
        return VC_REPORT(VC_ERROR_INVALID_SIZE);
    if (source->format == destination->format && copyBytes > VCImage_size(source))
        return VC_REPORT(VC_ERROR_INVALID_SIZE);
    if (destination->size != 0) {
        VCImage probe;
        probe.width = source->width;
        probe.height = source->height;
        probe.format = destination->format;
        probe.uvOffset = destination->uvOffset;
        if (destination->size < planesEnd(&probe)) return VC_REPORT(VC_ERROR_INVALID_SIZE);
    }
    // An even destination may take an odd geometry; only the reference loops
    // bound their chroma writes for that, so the external module (whose
    // writes cannot be known) does not get such a target.
    const bool evenTarget = VCImage_parityOk(destination->format, source->width, source->height);

    destination->width = source->width;
    destination->height = source->height;

    if (source->format == destination->format) {
        copySameFormat(source, destination, copyBytes);
        return VC_OK;
    }

    const bool srcRgb = VCImage_isRGB(source->format) != 0;
    const bool srcYuv = VCImage_isYUV(source->format) != 0;
    const bool dstRgb = VCImage_isRGB(destination->format) != 0;
    const bool dstYuv = VCImage_isYUV(destination->format) != 0;
    if (evenTarget && ((srcRgb && dstYuv) || (srcYuv && dstRgb))) {
        if (csc_run(source, destination) == VC_OK) {
            VF_LogMsg(VF_LOG_DEBUG, "[VCImage] Conversion successful with external CSC module");
            return VC_OK;
        }
    }

    if ((srcYuv || srcRgb) && (dstYuv || dstRgb) && VCConvert_fast(source, destination))
        return VC_OK;
    if (srcYuv && dstYuv) return yuvToYuv(source, destination);
    if (srcYuv && dstRgb) return yuvToRgb(source, destination);
    if (srcRgb && dstYuv) return rgbToYuv(source, destination);
    if (srcRgb && dstRgb) return rgbToRgb(source, destination);

    VF_LogMsg(VF_LOG_ERROR, "[VCImage] Can not convert %4.4s into %4.4s", fourcc(source->format),
              fourcc(destination->format));
    return VC_REPORT(VC_ERROR_UNSUPPORTED);
}

extern "C" VCImage* VCImage_copyAndConvert(const VCImage* source, uint32_t format) {
    if (source == nullptr) return nullptr;
    VCImage* copy = VCImage_createNew(source->width, source->height, format);
    if (copy == nullptr) return nullptr;
    if (VCImage_convert(source, copy) != VC_OK) {
        VCImage_destroy(copy);
        return nullptr;
    }
    return copy;
}
