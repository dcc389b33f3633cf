// The general JPEG codec: libjpeg-turbo's TurboJPEG API, used where the
// platform's fast codec is not installed.
#include <stdlib.h>
#include <string.h>
#include <turbojpeg.h>

#include <vector>

#include "vc_image_codec.h"
#include "vc_image_layout.h"

namespace {

class JpegReader : public VCPictureReader {
public:
    JpegReader(const unsigned char* bytes, size_t length)
        : mTurbo(tjInitDecompress()), mBytes(bytes), mLength(length) {}
    ~JpegReader() override {
        if (mTurbo != nullptr) tjDestroy(mTurbo);
    }

    bool readHeader(int* width, int* height) override {
        if (mTurbo == nullptr) return false;
        int subsampling = 0;
        int colorspace = 0;
        if (tjDecompressHeader3(mTurbo, mBytes, mLength, &mWidth, &mHeight, &subsampling,
                                &colorspace) != 0)
            return false;
        if (mWidth < 1 || mHeight < 1) return false;
        *width = mWidth;
        *height = mHeight;
        return true;
    }

    bool readRgba(unsigned char* rgba) override {
        return tjDecompress2(mTurbo, mBytes, mLength, rgba, mWidth, mWidth * 4, mHeight, TJPF_RGBA,
                             VC_JPEG_DECODE_FLAGS) == 0;
    }

    JpegReader(const JpegReader&) = delete;
    JpegReader& operator=(const JpegReader&) = delete;

private:
    tjhandle mTurbo;
    const unsigned char* mBytes;
    unsigned long mLength;
    int mWidth = 0;
    int mHeight = 0;
};

// TurboJPEG pixel format of an RGB-family or grey image, -1 otherwise.
int turboPixelFormat(uint32_t format) {
    switch (format) {
        case VC_FORMAT_RGBA:
            return TJPF_RGBA;
        case VC_FORMAT_BGRA:
            return TJPF_BGRA;
        case VC_FORMAT_ARGB:
            return TJPF_ARGB;
        case VC_FORMAT_ABGR:
            return TJPF_ABGR;
        case VC_FORMAT_RGB8:
            return TJPF_RGB;
        case VC_FORMAT_BGR8:
            return TJPF_BGR;
        case VC_FORMAT_GREY:
            return TJPF_GRAY;
        default:
            return -1;
    }
}

// The buffer must hold `needed` bytes; a size field of 0 means "as the geometry says".
bool holds(const VCImage* image, uint64_t needed) {
    return image->size == 0 || image->size >= needed;
}

// Where the stream goes: a malloc'ed buffer of the worst-case size that the
// record adopts as it is, or (when that cannot be had) one grown by TurboJPEG.
struct Output {
    unsigned char* jpeg = nullptr;
    unsigned long size = 0;
    int flags = VC_JPEG_ENCODE_FLAGS;
    bool ours = false;

    void reserve(int width, int height, int subsampling) {
        // tjBufSize computes in int: past 2^28 pixels TurboJPEG grows the buffer instead.
        if (static_cast<uint64_t>(width) * static_cast<uint64_t>(height) > (1u << 28)) return;
        unsigned long capacity = tjBufSize(width, height, subsampling);
        if (capacity == static_cast<unsigned long>(-1)) return;
        jpeg = static_cast<unsigned char*>(malloc(capacity));
        if (jpeg == nullptr) return;
        size = capacity;
        flags |= TJFLAG_NOREALLOC;
        ours = true;
    }
};

int encodePacked(tjhandle turbo, const VCImage* image, int pixelFormat, int quality, Output* out) {
    if (!holds(image, VCImage_requiredSize(image->width, image->height, image->format))) return -1;
    int subsampling = pixelFormat == TJPF_GRAY ? TJSAMP_GRAY : VC_JPEG_SUBSAMPLING;
    out->reserve(image->width, image->height, subsampling);
    // Pitch 0: rows tightly packed, as in every record.
    return tjCompress2(turbo, image->data, image->width, 0, image->height, pixelFormat, &out->jpeg,
                       &out->size, subsampling, quality, out->flags);
}

// 4:2:0 pictures go to the encoder as planes, without a trip through RGB;
// interleaved chroma is split into two planes first.
int encode420(tjhandle turbo, const VCImage* image, int quality, Output* out) {
    int w = image->width;
    int h = image->height;
    VCYuvLayout layout;
    if (w % 2 != 0 || h % 2 != 0 || !VCImage_yuvLayout(image, &layout)) return -1;
    size_t luma = static_cast<size_t>(w) * h;
    size_t quarter = luma / 4;
    size_t chromaStart = layout.uOffset < layout.vOffset ? layout.uOffset : layout.vOffset;
    if (chromaStart < luma || !holds(image, chromaStart + 2 * quarter)) return -1;
    const unsigned char* planes[3] = {image->data, image->data + layout.uOffset,
                                      image->data + layout.vOffset};
    std::vector<unsigned char> split;
    if (layout.chromaStep != 1) {
        split.resize(2 * quarter);
        const unsigned char* u = planes[1];
        const unsigned char* v = planes[2];
        for (size_t i = 0; i < quarter; ++i) {
            split[i] = u[2 * i];
            split[quarter + i] = v[2 * i];
        }
        planes[1] = split.data();
        planes[2] = split.data() + quarter;
    }
    out->reserve(w, h, TJSAMP_420);
    return tjCompressFromYUVPlanes(turbo, planes, w, nullptr, h, TJSAMP_420, &out->jpeg, &out->size,
                                   quality, out->flags);
}

// Packed 4:2:2 ("YUYV", "YVYU") is split into planes and encoded as 4:2:2.
int encode422(tjhandle turbo, const VCImage* image, int quality, Output* out) {
    int w = image->width;
    int h = image->height;
    VCYuvLayout layout;
    if (w % 2 != 0 || !VCImage_yuvLayout(image, &layout)) return -1;
    size_t luma = static_cast<size_t>(w) * h;
    if (!holds(image, 2 * luma)) return -1;
    std::vector<unsigned char> planar(2 * luma);
    unsigned char* y = planar.data();
    unsigned char* u = y + luma;
    unsigned char* v = u + luma / 2;
    const unsigned char* src = image->data;
    for (size_t i = 0; i < luma / 2; ++i, src += 4) {
        y[2 * i] = src[0];
        y[2 * i + 1] = src[2];
        u[i] = src[layout.uOffset];
        v[i] = src[layout.vOffset];
    }
    const unsigned char* planes[3] = {y, u, v};
    out->reserve(w, h, TJSAMP_422);
    return tjCompressFromYUVPlanes(turbo, planes, w, nullptr, h, TJSAMP_422, &out->jpeg, &out->size,
                                   quality, out->flags);
}

}  // namespace

std::unique_ptr<VCPictureReader> VCJpegReader_create(const unsigned char* bytes, size_t length) {
    return std::unique_ptr<VCPictureReader>(new JpegReader(bytes, length));
}

VCImage* VCJpeg_encode(const VCImage* image, int quality) {
    // A picture whose size the record cannot state is not taken.
    if (VCImage_requiredSize(image->width, image->height, image->format) == 0) return nullptr;
    tjhandle turbo = tjInitCompress();
    if (turbo == nullptr) return nullptr;
    Output output;
    int rc = -1;
    int pixelFormat = turboPixelFormat(image->format);
    if (pixelFormat >= 0) {
        rc = encodePacked(turbo, image, pixelFormat, quality, &output);
    } else if (VCImage_isYUV420(image->format)) {
        rc = encode420(turbo, image, quality, &output);
    } else if (image->format == VC_FORMAT_YUYV || image->format == VC_FORMAT_YVYU) {
        rc = encode422(turbo, image, quality, &output);
    }
    tjDestroy(turbo);

    unsigned char* stream = nullptr;
    if (rc == 0 && output.jpeg != nullptr && output.size > 0 && output.size <= UINT32_MAX) {
        if (output.ours) {
            // Give back the unused tail of the worst-case buffer.
            stream = static_cast<unsigned char*>(realloc(output.jpeg, output.size));
            if (stream == nullptr) stream = output.jpeg;
            output.jpeg = nullptr;
        } else {
            // The record frees its buffer with free(); TurboJPEG's own buffers
            // go back through tjFree.
            stream = static_cast<unsigned char*>(malloc(output.size));
            if (stream != nullptr) memcpy(stream, output.jpeg, output.size);
        }
    }
    if (output.jpeg != nullptr) {
        if (output.ours)
            free(output.jpeg);
        else
            tjFree(output.jpeg);
    }
    if (stream == nullptr) return nullptr;
    VCImage* out = VCImage_createEmpty(image->width, image->height, VC_FORMAT_JPEG);
    out->data = stream;
    out->size = static_cast<uint32_t>(output.size);
    return out;
}
