// Fixtures shared by the JPEG, PNG and file suites: test pictures, PNG and
// JPEG streams written straight through libpng and libjpeg.
#ifndef KIV_TESTS_JPEG_TEST_UTIL_H
#define KIV_TESTS_JPEG_TEST_UTIL_H

#include <dlfcn.h>
#include <png.h>
#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
#include <unistd.h>
// jpeglib.h needs stdio.h (FILE) before it.
#include <jpeglib.h>

#include <string>
#include <vector>

#include "support/log_capture.h"
#include "support/temp_dir.h"
#include "../vc_error_lines.h"
#include "vccore/vc_image.h"

namespace jpegtest {

using kivtest::Bytes;
using kivtest::fileExists;
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

// A PNG stream written directly with libpng. `rows` holds the samples as the
// colour type and depth lay them out (16-bit samples big-endian).
struct PngPicture {
    int width = 1;
    int height = 1;
    int colorType = PNG_COLOR_TYPE_RGB_ALPHA;
    int bitDepth = 8;
    bool interlaced = false;
    Bytes samples;
    std::vector<png_color> palette;
    Bytes paletteAlpha;
};

inline void appendToVector(png_structp png, png_bytep data, png_size_t length) {
    Bytes* out = static_cast<Bytes*>(png_get_io_ptr(png));
    out->insert(out->end(), data, data + length);
}

inline Bytes makePng(const PngPicture& picture) {
    Bytes out;
    png_structp png = png_create_write_struct(PNG_LIBPNG_VER_STRING, nullptr, nullptr, nullptr);
    png_infop info = png_create_info_struct(png);
    png_set_write_fn(png, &out, appendToVector, nullptr);
    png_set_IHDR(png, info, picture.width, picture.height, picture.bitDepth, picture.colorType,
                 picture.interlaced ? PNG_INTERLACE_ADAM7 : PNG_INTERLACE_NONE,
                 PNG_COMPRESSION_TYPE_DEFAULT, PNG_FILTER_TYPE_DEFAULT);
    if (!picture.palette.empty())
        png_set_PLTE(png, info, picture.palette.data(), static_cast<int>(picture.palette.size()));
    if (!picture.paletteAlpha.empty())
        png_set_tRNS(png, info, picture.paletteAlpha.data(),
                     static_cast<int>(picture.paletteAlpha.size()), nullptr);
    png_write_info(png, info);
    size_t stride = picture.samples.size() / picture.height;
    std::vector<png_bytep> rows(picture.height);
    for (int y = 0; y < picture.height; ++y)
        rows[y] = const_cast<png_bytep>(picture.samples.data()) + y * stride;
    png_write_image(png, rows.data());
    png_write_end(png, nullptr);
    png_destroy_write_struct(&png, &info);
    return out;
}

// A JPEG stream written directly with libjpeg at quality 100: `samples`
// holds `components` interleaved bytes a pixel in `input` colours, stored as
// `stored` (libjpeg converts where they differ). Adobe's marker (which says
// how CMYK inks are stored) is written as libjpeg does by default, or not.
inline Bytes makeJpeg(int width, int height, J_COLOR_SPACE input, int components,
                      J_COLOR_SPACE stored, const Bytes& samples, bool adobeMarker = true) {
    jpeg_compress_struct info;
    jpeg_error_mgr error;
    info.err = jpeg_std_error(&error);
    jpeg_create_compress(&info);
    unsigned char* stream = nullptr;
    unsigned long length = 0;
    jpeg_mem_dest(&info, &stream, &length);
    info.image_width = static_cast<JDIMENSION>(width);
    info.image_height = static_cast<JDIMENSION>(height);
    info.input_components = components;
    info.in_color_space = input;
    jpeg_set_defaults(&info);
    jpeg_set_colorspace(&info, stored);
    if (!adobeMarker) info.write_Adobe_marker = FALSE;
    jpeg_set_quality(&info, 100, TRUE);
    jpeg_start_compress(&info, TRUE);
    while (info.next_scanline < info.image_height) {
        JSAMPROW row = const_cast<JSAMPROW>(samples.data()) +
                       static_cast<size_t>(info.next_scanline) * width * components;
        jpeg_write_scanlines(&info, &row, 1);
    }
    jpeg_finish_compress(&info);
    jpeg_destroy_compress(&info);
    Bytes out(stream, stream + length);
    free(stream);
    return out;
}

}  // namespace jpegtest

#endif
