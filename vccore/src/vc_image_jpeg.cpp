// JPEG encoding and decoding of image records: the platform's fast codec when
// it is installed, the general codecs otherwise.
#include <dlfcn.h>
#include <limits.h>
#include <stdlib.h>

#include "vc_image_codec.h"
#include "vc_image_layout.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_file.h"
#include "vccore/vc_log.h"
#include "vccore/vc_stream.h"

namespace {

// The fast codec is opened for one call and closed right after it, so that
// nothing of it stays mapped between pictures.
class FastCodec {
public:
    FastCodec() : mHandle(dlopen(VC_FAST_JPEG_LIBRARY, RTLD_NOW | RTLD_LOCAL)) {}
    ~FastCodec() {
        if (mHandle != nullptr) dlclose(mHandle);
    }
    void* entry(const char* name) const {
        return mHandle != nullptr ? dlsym(mHandle, name) : nullptr;
    }
    bool present() const { return mHandle != nullptr; }

    FastCodec(const FastCodec&) = delete;
    FastCodec& operator=(const FastCodec&) = delete;

private:
    void* mHandle;
};

// Null when the fast codec refuses the picture.
VCImage* encodeWithFastCodec(VCFastJpegEncode_t encode, const VCImage* image, int quality) {
    uint32_t length = 0;
    unsigned char* stream = encode(image->data, VCImage_size(image), image->width, image->height,
                                   image->format, &length, quality);
    if (stream == nullptr) return nullptr;
    if (length == 0) {
        free(stream);
        return nullptr;
    }
    VCImage* out = VCImage_createEmpty(image->width, image->height, VC_FORMAT_JPEG);
    out->data = stream;
    out->size = length;
    return out;
}

bool decodeWithFastCodec(VCImage* image, const unsigned char* bytes, int length) {
    FastCodec codec;
    auto decode = reinterpret_cast<VCFastJpegDecode_t>(codec.entry(VC_FAST_JPEG_DECODE));
    if (decode == nullptr) return false;
    int width = 0;
    int height = 0;
    unsigned char* pixels =
        decode(bytes, static_cast<uint32_t>(length), &width, &height, image->format);
    if (pixels == nullptr) return false;
    if (width < 1 || height < 1) {
        free(pixels);
        return false;
    }
    VCImage_deallocate(image);
    image->data = pixels;
    image->width = width;
    image->height = height;
    return true;
}

// Formats converted from RGBA a band of rows at a time: rows depend only on
// their own pair of source rows, and one chroma plane follows the luma.
bool convertsInBands(uint32_t format) {
    return format == VC_FORMAT_NV21 || format == VC_FORMAT_NV12;
}

// Rows of a band: even (4:2:0 chroma pairs them), and small enough for the
// cache.
const int kBandRows = 16;

thread_local VCDecodeFailure tLastFailure = VC_DECODE_OK;

// Records why a decoding failed and returns its status unchanged.
int failed(VCDecodeFailure why, int status) {
    tLastFailure = why;
    return status;
}

// Reports a failure that arises here: the error line, and why.
#define DECODE_FAILED(why, code) failed((why), VC_REPORT(code))

// A reader's own account of its failure; a stream it stopped on without one
// is taken as damaged.
VCDecodeFailure failureOf(const VCPictureReader& reader) {
    VCDecodeFailure why = reader.failure();
    return why == VC_DECODE_OK ? VC_DECODE_CORRUPT : why;
}

// Puts the record back as the caller handed it in unless the decoding is
// kept: whatever fails, the caller finds the same fields and buffer (the
// pixels of a buffer it brought may hold part of a picture).
class RecordGuard {
public:
    explicit RecordGuard(VCImage* image)
        : mImage(image),
          mData(image->data),
          mWidth(image->width),
          mHeight(image->height),
          mFormat(image->format),
          mWrapped(image->wrapped),
          mSize(image->size),
          mUvOffset(image->uvOffset) {}
    ~RecordGuard() {
        if (mKept) return;
        if (mImage->data != mData) VCImage_deallocate(mImage);  // a buffer made here
        mImage->data = mData;
        mImage->width = mWidth;
        mImage->height = mHeight;
        mImage->format = mFormat;
        mImage->wrapped = mWrapped;
        mImage->size = mSize;
        mImage->uvOffset = mUvOffset;
    }
    void keep() { mKept = true; }

    RecordGuard(const RecordGuard&) = delete;
    RecordGuard& operator=(const RecordGuard&) = delete;

private:
    VCImage* mImage;
    unsigned char* mData;
    int32_t mWidth;
    int32_t mHeight;
    uint32_t mFormat;
    int32_t mWrapped;
    uint32_t mSize;
    uint32_t mUvOffset;
    bool mKept = false;
};

// Decodes into `image` (which has the picture's geometry and a buffer) band by
// band through a small RGBA buffer: no picture-sized RGBA intermediate.
int decodeInBands(VCPictureReader& reader, VCImage* image) {
    const int width = image->width;
    const int height = image->height;
    unsigned char* band =
        static_cast<unsigned char*>(malloc(static_cast<size_t>(width) * 4 * kBandRows));
    if (band == nullptr) return DECODE_FAILED(VC_DECODE_NO_MEMORY, VC_ERROR_ALLOC_FAILED);
    const size_t luma = static_cast<size_t>(width) * height;
    const size_t chroma = image->uvOffset != 0 ? image->uvOffset : luma;
    int converted = 0;
    bool ok = reader.readRgbaBands(band, kBandRows, [&](int first, int count) {
        // The band's rows of the picture, their chroma rows where the
        // picture keeps them.
        size_t start = static_cast<size_t>(first) * width;
        size_t bandChroma = chroma + static_cast<size_t>(first / 2) * width;
        VCImage* from = VCImage_createWrap(band, width, count, VC_FORMAT_RGBA, 0, 0);
        VCImage* to = VCImage_createWrap(image->data + start, width, count, image->format, 0,
                                         static_cast<uint32_t>(bandChroma - start));
        converted = (from != nullptr && to != nullptr) ? VCImage_convert(from, to)
                                                       : VC_REPORT(VC_ERROR_ALLOC_FAILED);
        VCImage_destroy(from);
        VCImage_destroy(to);
        return converted == 0;
    });
    free(band);
    if (converted != 0) return failed(VC_DECODE_CONVERSION, converted);
    return ok ? 0 : DECODE_FAILED(failureOf(reader), VC_ERROR_CODEC_FAILED);
}

// Why the record could not get a buffer of its own for the picture.
VCDecodeFailure allocationFailure(int status) {
    switch (status) {
        case VC_ERROR_INVALID_SIZE:
            return VC_DECODE_TOO_LARGE;  // more than a record's byte count holds
        case VC_ERROR_INVALID_PARAM:
            return VC_DECODE_CONVERSION;  // a format without a pixel size
        default:
            return VC_DECODE_NO_MEMORY;
    }
}

// The general decoders write straight-alpha RGBA; NV21 and NV12 are converted
// band by band, other formats through a temporary RGBA picture.
int decodeGeneral(VCImage* image, const unsigned char* bytes, int length) {
    std::unique_ptr<VCPictureReader> reader =
        VCPictureReader_create(bytes, static_cast<size_t>(length));
    if (reader == nullptr) return DECODE_FAILED(VC_DECODE_NOT_A_PICTURE, VC_ERROR_CODEC_FAILED);
    int width = 0;
    int height = 0;
    if (!reader->readHeader(&width, &height))
        return DECODE_FAILED(failureOf(*reader), VC_ERROR_CODEC_FAILED);
    // A picture the record cannot describe is refused before anything is allocated.
    uint32_t rgbaSize = VCImage_requiredSize(width, height, VC_FORMAT_RGBA);
    if (rgbaSize == 0) return DECODE_FAILED(VC_DECODE_TOO_LARGE, VC_ERROR_CODEC_FAILED);
    // An existing buffer too small for the picture is refused before the
    // record changes: decoding or converting into it would write past its
    // end. It is measured with the geometry it was made for.
    uint32_t required = VCImage_requiredSize(width, height, image->format);
    if (image->data != nullptr && required != 0 && VCImage_size(image) < required)
        return DECODE_FAILED(VC_DECODE_NO_ROOM, VC_ERROR_INVALID_SIZE);

    // The record takes the picture's geometry and, without a buffer, gets
    // one; the pixels are then decoded straight into it.
    RecordGuard guard(image);
    image->width = width;
    image->height = height;
    if (image->data == nullptr) {
        int allocated = VCImage_allocate(image);
        if (allocated < 0) return failed(allocationFailure(allocated), allocated);
    }
    int rc = 0;
    if (convertsInBands(image->format) && required != 0) {
        rc = decodeInBands(*reader, image);
    } else {
        const bool inPlace = image->format == VC_FORMAT_RGBA;
        VCImage* rgba = inPlace ? VCImage_createWrap(image->data, width, height, VC_FORMAT_RGBA,
                                                     static_cast<int>(rgbaSize), 0)
                                : VCImage_createNew(width, height, VC_FORMAT_RGBA);
        if (rgba == nullptr)
            return DECODE_FAILED(rgbaSize > INT_MAX ? VC_DECODE_TOO_LARGE : VC_DECODE_NO_MEMORY,
                                 VC_ERROR_ALLOC_FAILED);
        if (!reader->readRgba(rgba->data)) {
            rc = DECODE_FAILED(failureOf(*reader), VC_ERROR_CODEC_FAILED);
        } else if (!inPlace) {
            rc = VCImage_convert(rgba, image);
            if (rc != 0) failed(VC_DECODE_CONVERSION, rc);
        }
        VCImage_destroy(rgba);
    }
    if (rc == 0) guard.keep();
    return rc;
}

bool startsWith(const unsigned char* bytes, size_t length, const unsigned char* prefix,
                size_t count) {
    if (length < count) return false;
    for (size_t i = 0; i < count; ++i)
        if (bytes[i] != prefix[i]) return false;
    return true;
}

const unsigned char kJpegStart[] = {0xFF, 0xD8};
const unsigned char kPngSignature[] = {0x89, 'P', 'N', 'G', '\r', '\n', 0x1A, '\n'};

}  // namespace

size_t VCByteInput::pull(unsigned char* to, size_t count) {
    size_t got = 0;
    for (; got < count && headUsed < headLength; ++got) to[got] = head[headUsed++];
    while (got < count && !failed) {
        const long n = source(user, to + got, count - got);
        if (n < 0 || (size_t)n > count - got) failed = true;
        if (n <= 0 || failed) break;
        got += (size_t)n;
    }
    return got;
}

std::unique_ptr<VCPictureReader> VCPictureReader_create(const unsigned char* bytes, size_t length) {
    VCByteInput input;
    input.bytes = bytes;
    input.length = length;
    return VCPictureReader_create(input);
}

std::unique_ptr<VCPictureReader> VCPictureReader_create(VCByteInput input) {
    if (input.pulled()) {
        input.headLength = input.pull(input.head, sizeof(input.head));
        input.headUsed = 0;
    }
    const unsigned char* start = input.pulled() ? input.head : input.bytes;
    const size_t length = input.pulled() ? input.headLength : input.length;
    if (startsWith(start, length, kJpegStart, sizeof(kJpegStart)))
        return VCJpegReader_create(input);
    if (startsWith(start, length, kPngSignature, sizeof(kPngSignature)))
        return VCPngReader_create(input);
    return nullptr;
}

extern "C" int VCStream_fastJpegCodecInstalled(void) {
    return FastCodec().present() ? 1 : 0;
}

extern "C" VCImage* VCImage_encodeToJpeg(const VCImage* image, int quality) {
    if (image == nullptr || image->data == nullptr) return nullptr;
    if (quality < 1 || quality > 100) quality = 85;
    VCImage* out = nullptr;
    if (image->width > 0 && image->height > 0 && image->format != 0) {
        FastCodec codec;
        if (codec.present()) {
            auto encode = reinterpret_cast<VCFastJpegEncode_t>(codec.entry(VC_FAST_JPEG_ENCODE));
            if (encode != nullptr) out = encodeWithFastCodec(encode, image, quality);
        } else {
            out = VCJpeg_encode(image, quality);
        }
    }
    if (out == nullptr)
        VF_LogMsg(VF_LOG_ERROR, "Encoding failed (%dx%d %4.4s)", image->width, image->height,
                  reinterpret_cast<const char*>(&image->format));
    return out;
}

extern "C" int VCImage_decodeFromJpeg(VCImage* image, const unsigned char* bytes, int length) {
    // Arguments without a stream count as no picture.
    tLastFailure = VC_DECODE_NOT_A_PICTURE;
    if (image == nullptr || bytes == nullptr || length == 0) return VC_REPORT(VC_ERROR_NULL_PARAM);
    if (length < 0) return VC_REPORT(VC_ERROR_INVALID_PARAM);
    tLastFailure = VC_DECODE_OK;
    if (image->format != 0 &&
        startsWith(bytes, static_cast<size_t>(length), kJpegStart, sizeof(kJpegStart)) &&
        decodeWithFastCodec(image, bytes, length))
        return 0;
    return decodeGeneral(image, bytes, length);
}

extern "C" int VCPicture_readHeader(const unsigned char* bytes, int length, int* width,
                                    int* height) {
    tLastFailure = VC_DECODE_NOT_A_PICTURE;
    if (bytes == nullptr || length <= 0 || width == nullptr || height == nullptr)
        return VC_REPORT(VC_ERROR_NULL_PARAM);
    tLastFailure = VC_DECODE_OK;
    std::unique_ptr<VCPictureReader> reader =
        VCPictureReader_create(bytes, static_cast<size_t>(length));
    if (reader == nullptr) return DECODE_FAILED(VC_DECODE_NOT_A_PICTURE, VC_ERROR_CODEC_FAILED);
    if (!reader->readHeader(width, height))
        return DECODE_FAILED(failureOf(*reader), VC_ERROR_CODEC_FAILED);
    return 0;
}

extern "C" VCDecodeFailure VCPicture_lastFailure(void) {
    return tLastFailure;
}

void VCPicture_setLastFailure(VCDecodeFailure failure) {
    tLastFailure = failure;
}

extern "C" const char* VCPicture_failureText(VCDecodeFailure failure) {
    switch (failure) {
        case VC_DECODE_OK:
            return "no failure";
        case VC_DECODE_NOT_A_PICTURE:
            return "it is not a JPEG or PNG picture";
        case VC_DECODE_TRUNCATED:
            return "the data is truncated";
        case VC_DECODE_CORRUPT:
            return "the data is corrupt";
        case VC_DECODE_UNSUPPORTED_COLOR:
            return "its colour space is not supported";
        case VC_DECODE_UNSUPPORTED_CODING:
            return "its coding is not supported (such as 12-bit or lossless JPEG)";
        case VC_DECODE_TOO_LARGE:
            return "the picture is too large";
        case VC_DECODE_NO_MEMORY:
            return "out of memory";
        case VC_DECODE_NO_ROOM:
            return "the image's buffer is too small for the picture";
        case VC_DECODE_CONVERSION:
            return "the pixels cannot be converted into the image's format";
        case VC_DECODE_READ_FAILED:
            return "the file cannot be read";
    }
    return "unknown failure";
}
