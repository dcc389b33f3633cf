// Stream layout of the fast-codec stand-in, shared with its tests.
#ifndef KIV_TESTS_JPEG_STANDIN_H
#define KIV_TESTS_JPEG_STANDIN_H

#include <stdint.h>

// Starts with the JPEG start-of-image marker, like a real stream.
#define JPEG_STANDIN_MAGIC "\xFF\xD8KIVF"
#define JPEG_STANDIN_RGBA 0x41424752u
#define JPEG_STANDIN_NV21 0x3132564Eu

struct JpegStandinHeader {
    char magic[6];
    char pad[2];
    int32_t width;
    int32_t height;
    uint32_t format;
    int32_t quality;
    uint32_t size;
};

#endif
