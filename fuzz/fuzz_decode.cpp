// Fuzzes VCImage_decodeFromJpeg: stream sniffing, the general JPEG and PNG
// decoders, the size checks and the conversion into the requested format.
#include <limits.h>
#include <stddef.h>
#include <stdint.h>

#include <memory>

#include "vc_image_codec.h"
#include "vccore/vc_file.h"
#include "vccore/vc_log.h"

namespace {

void quietLog(int, const char*, ...) {}

// Pictures are capped at 4096×4096 here so that a header promising a huge
// (but still representable) picture does not trip the fuzzer's memory limit;
// the library's own refusal of unrepresentable sizes is covered by its tests.
const uint64_t kMaxPixels = 4096ull * 4096ull;

// The size the library's own decoders read from the header (JPEG or PNG).
bool declaresTooMuch(const uint8_t* data, size_t size) {
    std::unique_ptr<VCPictureReader> reader = VCPictureReader_create(data, size);
    int w = 0, h = 0;
    return reader != nullptr && reader->readHeader(&w, &h) &&
           uint64_t(w) * uint64_t(h) > kMaxPixels;
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***) {
    VF_LogMsg = quietLog;
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size > INT_MAX || declaresTooMuch(data, size)) return 0;
    static const uint32_t kFormats[] = {VC_FORMAT_RGBA, VC_FORMAT_BGR8, VC_FORMAT_NV21,
                                        VC_FORMAT_GREY, VC_FORMAT_YUYV};
    uint32_t format = kFormats[size % (sizeof(kFormats) / sizeof(kFormats[0]))];

    VCImage* image = VCImage_createEmpty(0, 0, format);
    int rc = VCImage_decodeFromJpeg(image, data, static_cast<int>(size));
    if (rc == 0) {
        // A decoded record must describe a buffer of its full size.
        uint32_t n = VCImage_size(image);
        if (image->data == nullptr || n == 0 || image->width < 1 || image->height < 1)
            __builtin_trap();
        volatile unsigned char sink = image->data[0] ^ image->data[n - 1];
        (void)sink;
        // Again into a small buffer of its own: the capacity check must hold.
        VCImage* small = VCImage_createNew(8, 8, format);
        VCImage_decodeFromJpeg(small, data, static_cast<int>(size));
        VCImage_destroy(small);
    } else if (image->data != nullptr) {
        // A failure after the record took the picture's geometry (a refused
        // conversion) leaves the buffer made for it: the record must still
        // describe that buffer.
        uint32_t n = VCImage_size(image);
        if (n == 0 || image->wrapped != 0) __builtin_trap();
        volatile unsigned char sink = image->data[0] ^ image->data[n - 1];
        (void)sink;
    } else if (image->width != 0 || image->height != 0) {
        __builtin_trap();  // a stream that does not decode leaves the record as it was
    }
    VCImage_destroy(image);
    return 0;
}
