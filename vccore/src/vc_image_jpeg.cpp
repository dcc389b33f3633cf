// JPEG encoding and decoding of image records: the platform's fast codec when
// it is installed, the general codecs otherwise.
#include <dlfcn.h>
#include <stdlib.h>

#include "vc_image_codec.h"
#include "vc_image_layout.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_file.h"
#include "vccore/vc_log.h"

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

// Decodes into `image` (which has the picture's geometry and a buffer) band by
// band through a small RGBA buffer: no picture-sized RGBA intermediate.
int decodeInBands(VCPictureReader& reader, VCImage* image) {
    const int width = image->width;
    const int height = image->height;
    unsigned char* band =
        static_cast<unsigned char*>(malloc(static_cast<size_t>(width) * 4 * kBandRows));
    if (band == nullptr) return VC_REPORT(VC_ERROR_ALLOC_FAILED);
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
        converted =
            (from != nullptr && to != nullptr) ? VCImage_convert(from, to) : VC_ERROR_ALLOC_FAILED;
        VCImage_destroy(from);
        VCImage_destroy(to);
        return converted == 0;
    });
    free(band);
    if (converted != 0) return converted;
    return ok ? 0 : VC_ERROR_CODEC_FAILED;
}

// The general decoders write straight-alpha RGBA; NV21 and NV12 are converted
// band by band, other formats through a temporary RGBA picture.
int decodeGeneral(VCImage* image, const unsigned char* bytes, int length) {
    std::unique_ptr<VCPictureReader> reader =
        VCPictureReader_create(bytes, static_cast<size_t>(length));
    int width = 0;
    int height = 0;
    if (reader == nullptr || !reader->readHeader(&width, &height))
        return VC_REPORT(VC_ERROR_CODEC_FAILED);
    // A picture the record cannot describe is refused before anything is allocated.
    uint32_t rgbaSize = VCImage_requiredSize(width, height, VC_FORMAT_RGBA);
    if (rgbaSize == 0) return VC_REPORT(VC_ERROR_CODEC_FAILED);
    // An existing buffer too small for the picture is refused before the
    // record changes: decoding or converting into it would write past its
    // end. It is measured with the geometry it was made for.
    uint32_t required = VCImage_requiredSize(width, height, image->format);
    if (image->data != nullptr && required != 0 && VCImage_size(image) < required)
        return VC_REPORT(VC_ERROR_INVALID_SIZE);

    // The record takes the picture's geometry and, without a buffer, gets
    // one; a later failure leaves it so.
    const int oldWidth = image->width;
    const int oldHeight = image->height;
    const bool hadBuffer = image->data != nullptr;
    image->width = width;
    image->height = height;
    if (!hadBuffer) {
        int allocated = VCImage_allocate(image);
        if (allocated < 0) return allocated;
    }
    // The pixels are decoded only now, straight into their buffer; a stream
    // that fails here is one that does not decode at all, which leaves the
    // record as it was (bar the pixels of a buffer it had).
    auto undecodable = [&] {
        if (!hadBuffer) VCImage_deallocate(image);
        image->width = oldWidth;
        image->height = oldHeight;
        return VC_REPORT(VC_ERROR_CODEC_FAILED);
    };
    if (convertsInBands(image->format) && required != 0) {
        int rc = decodeInBands(*reader, image);
        return rc == VC_ERROR_CODEC_FAILED ? undecodable() : rc;
    }
    const bool inPlace = image->format == VC_FORMAT_RGBA;
    VCImage* rgba = inPlace ? VCImage_createWrap(image->data, width, height, VC_FORMAT_RGBA,
                                                 static_cast<int>(rgbaSize), 0)
                            : VCImage_createNew(width, height, VC_FORMAT_RGBA);
    if (rgba == nullptr) return VC_REPORT(VC_ERROR_ALLOC_FAILED);
    if (!reader->readRgba(rgba->data)) {
        VCImage_destroy(rgba);
        return undecodable();
    }
    int rc = inPlace ? 0 : VCImage_convert(rgba, image);
    VCImage_destroy(rgba);
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

std::unique_ptr<VCPictureReader> VCPictureReader_create(const unsigned char* bytes, size_t length) {
    if (startsWith(bytes, length, kJpegStart, sizeof(kJpegStart)))
        return VCJpegReader_create(bytes, length);
    if (startsWith(bytes, length, kPngSignature, sizeof(kPngSignature)))
        return VCPngReader_create(bytes, length);
    return nullptr;
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
    if (image == nullptr || bytes == nullptr || length == 0) return VC_REPORT(VC_ERROR_NULL_PARAM);
    if (length < 0) return VC_REPORT(VC_ERROR_INVALID_PARAM);
    if (image->format != 0 &&
        startsWith(bytes, static_cast<size_t>(length), kJpegStart, sizeof(kJpegStart)) &&
        decodeWithFastCodec(image, bytes, length))
        return 0;
    return decodeGeneral(image, bytes, length);
}
