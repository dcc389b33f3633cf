// Fuzzes VCImage_decodeFromJpeg: stream sniffing, the general JPEG and PNG
// decoders, the size checks, the conversion into the requested format, and
// the promise that a failed decoding leaves the record as it found it.
#include <limits.h>
#include <stddef.h>
#include <stdint.h>

#include "vccore/vc_file.h"
#include "vccore/vc_log.h"
#include "vccore/vc_picture.h"

namespace {

void quietLog(int, const char*, ...) {}

// Above this many pixels a picture is not decoded into a fresh record (its
// buffer would trip the fuzzer's memory limit); such headers still go through
// every refusal that comes before an allocation.
const uint64_t kMaxPixels = 4096ull * 4096ull;

struct Fields {
    unsigned char* data;
    int32_t width, height;
    uint32_t format;
    int32_t wrapped;
    uint32_t size, uvOffset;
};

Fields fieldsOf(const VCImage* image) {
    return {image->data,    image->width, image->height,  image->format,
            image->wrapped, image->size,  image->uvOffset};
}

bool same(const Fields& a, const Fields& b) {
    return a.data == b.data && a.width == b.width && a.height == b.height && a.format == b.format &&
           a.wrapped == b.wrapped && a.size == b.size && a.uvOffset == b.uvOffset;
}

void check(bool condition) {
    if (!condition) __builtin_trap();
}

// Decodes into `image`; a failure must leave it untouched and give a reason,
// a success must describe a whole buffer. True on success.
bool decodeChecked(VCImage* image, const uint8_t* data, size_t size) {
    const Fields before = fieldsOf(image);
    int rc = VCImage_decodeFromJpeg(image, data, static_cast<int>(size));
    if (rc != 0) {
        check(same(before, fieldsOf(image)));
        check(VCPicture_lastFailure() != VC_DECODE_OK);
        return false;
    }
    check(VCPicture_lastFailure() == VC_DECODE_OK);
    uint32_t n = VCImage_size(image);
    check(image->data != nullptr && n != 0 && image->width >= 1 && image->height >= 1);
    volatile unsigned char sink = image->data[0] ^ image->data[n - 1];
    (void)sink;
    return true;
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***) {
    VF_LogMsg = quietLog;
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size > INT_MAX) return 0;
    static const uint32_t kFormats[] = {VC_FORMAT_RGBA, VC_FORMAT_BGR8, VC_FORMAT_NV21,
                                        VC_FORMAT_GREY, VC_FORMAT_YUYV};
    uint32_t format = kFormats[size % (sizeof(kFormats) / sizeof(kFormats[0]))];

    // The header alone: what the decoder will find, at no cost.
    int width = 0, height = 0;
    bool header = VCPicture_readHeader(data, static_cast<int>(size), &width, &height) == 0;
    check(!header || (width >= 1 && height >= 1));
    const bool huge = header && uint64_t(width) * uint64_t(height) > kMaxPixels;

    // A small buffer of its own: a picture that does not fit is refused
    // before anything changes, however large its header says it is.
    VCImage* small = VCImage_createNew(8, 8, format);
    if (decodeChecked(small, data, size)) check(header && small->width == width);
    VCImage_destroy(small);

    // A fresh record: pictures of every size up to the format limits, except
    // the huge ones whose buffer a record could really hold.
    uint32_t bytes = header ? VCImage_requiredSize(width, height, format) : 0;
    if (huge && bytes != 0 && bytes <= INT_MAX) return 0;
    VCImage* image = VCImage_createEmpty(0, 0, format);
    if (decodeChecked(image, data, size)) {
        check(header && image->width == width && image->height == height);
        check(!huge);
    }
    VCImage_destroy(image);
    return 0;
}
