// Stand-in for the platform's fast JPEG codec. It does not compress: its
// "stream" is a recognisable header followed by the pixels, so tests can
// tell which codec produced or read a picture. Like a hardware codec it only
// takes "RGBA" and "NV21" pictures and refuses everything else.
#include <stdint.h>
#include <stdlib.h>
#include <string.h>

#include "jpeg_standin.h"

namespace {

bool supported(uint32_t format) {
    return format == JPEG_STANDIN_RGBA || format == JPEG_STANDIN_NV21;
}

}  // namespace

extern "C" __attribute__((visibility("default"))) unsigned char* fastJpegEncode(
    const unsigned char* pixels, uint32_t size, int width, int height, uint32_t format,
    uint32_t* length, int quality) {
    if (pixels == nullptr || length == nullptr || !supported(format) || size == 0) return nullptr;
    JpegStandinHeader header;
    memcpy(header.magic, JPEG_STANDIN_MAGIC, sizeof(header.magic));
    header.width = width;
    header.height = height;
    header.format = format;
    header.quality = quality;
    header.size = size;
    unsigned char* stream = static_cast<unsigned char*>(malloc(sizeof(header) + size));
    if (stream == nullptr) return nullptr;
    memcpy(stream, &header, sizeof(header));
    memcpy(stream + sizeof(header), pixels, size);
    *length = static_cast<uint32_t>(sizeof(header) + size);
    return stream;
}

extern "C" __attribute__((visibility("default"))) unsigned char* fastJpegDecode(
    const unsigned char* bytes, uint32_t length, int* width, int* height, uint32_t format) {
    JpegStandinHeader header;
    if (bytes == nullptr || length < sizeof(header)) return nullptr;
    memcpy(&header, bytes, sizeof(header));
    if (memcmp(header.magic, JPEG_STANDIN_MAGIC, sizeof(header.magic)) != 0) return nullptr;
    if (header.format != format || header.size != length - sizeof(header)) return nullptr;
    unsigned char* pixels = static_cast<unsigned char*>(malloc(header.size));
    if (pixels == nullptr) return nullptr;
    memcpy(pixels, bytes + sizeof(header), header.size);
    *width = header.width;
    *height = header.height;
    return pixels;
}
