// Fixtures shared by the JPEG, PNG and file suites: test pictures and what
// they need of the shared stream makers and files.
#ifndef KIV_TESTS_JPEG_TEST_UTIL_H
#define KIV_TESTS_JPEG_TEST_UTIL_H

#include <dlfcn.h>
#include <stdint.h>
#include <stdlib.h>
#include <unistd.h>

#include <string>
#include <vector>

#include "support/log_capture.h"
#include "support/picture_streams.h"
#include "support/temp_dir.h"
#include "../vc_error_lines.h"
#include "vccore/vc_image.h"

namespace jpegtest {

using kivtest::Bytes;
using kivtest::fileExists;
using kivtest::findMarker;
using kivtest::jpegDeclaring;
using kivtest::makeJpeg;
using kivtest::makePng;
using kivtest::pngDeclaring;
using kivtest::PngPicture;
using kivtest::readFile;
using kivtest::TempDir;
using kivtest::writeFile;

// Whether the platform's fast JPEG codec can be opened in this process.
inline bool fastCodecInstalled() {
    void* handle = dlopen("libkivjpeginterface.so", RTLD_NOW);
    if (handle != nullptr) dlclose(handle);
    return handle != nullptr;
}

// A smooth picture with some texture, like a camera frame: R, G, B, A at (x, y).
inline void gradientPixel(int x, int y, int w, int h, unsigned char* p) {
    p[0] = static_cast<unsigned char>(x * 255 / (w > 1 ? w - 1 : 1));
    p[1] = static_cast<unsigned char>(y * 255 / (h > 1 ? h - 1 : 1));
    p[2] = static_cast<unsigned char>((x + y) * 2 % 256 < 128 ? 64 : 192);
    p[3] = 255;
}

// An owning RGBA picture of gradientPixel.
inline VCImage* makeRgba(int w, int h) {
    VCImage* image = VCImage_createNew(w, h, VC_FORMAT_RGBA);
    for (int y = 0; y < h; ++y)
        for (int x = 0; x < w; ++x) gradientPixel(x, y, w, h, image->data + (y * w + x) * 4);
    return image;
}

// The pixels of a record (VCImage_size bytes) and its geometry as "WxH".
inline Bytes bytesOf(const VCImage* image) {
    return Bytes(image->data, image->data + VCImage_size(image));
}
inline std::string shapeOf(const VCImage* image) {
    return std::to_string(image->width) + "x" + std::to_string(image->height);
}

}  // namespace jpegtest

#endif
