// Picture streams written straight through libpng and libjpeg, and the
// small surgery tests do on them (headers promising other sizes), shared by
// the image-core and command-line suites.
#ifndef KIV_TESTS_SUPPORT_PICTURE_STREAMS_H
#define KIV_TESTS_SUPPORT_PICTURE_STREAMS_H

#include <png.h>
#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
// jpeglib.h needs stdio.h (FILE) before it.
#include <jpeglib.h>

#include <algorithm>
#include <vector>

#include "support/image_ptr.h"
#include "support/temp_dir.h"
#include "vccore/vc_file.h"
#include "vccore/vc_picture.h"

namespace kivtest {

// `image` encoded by the library itself, as a JPEG at `quality` or as a PNG
// (straight alpha kept); empty when it cannot be.
inline Bytes encodeJpeg(const VCImage* image, int quality = 90) {
    ImagePtr jpeg(VCImage_encodeToJpeg(image, quality));
    return jpeg != nullptr ? VCImageTest_bytes(*jpeg) : Bytes();
}
inline Bytes encodePng(const VCImage* image) {
    size_t length = 0;
    unsigned char* png = VCPicture_encodePng(image, &length);
    Bytes out(png, png + (png != nullptr ? length : 0));
    free(png);
    return out;
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

// The JPEG quality probe: the stream's luminance quantisation table, sorted
// (their order does not matter for telling qualities apart), and libjpeg's
// base table scaled for a quality as its encoder does it.
inline std::vector<int> lumaTable(const Bytes& jpeg) {
    for (size_t i = 2; i + 5 + 64 < jpeg.size(); ++i) {
        if (jpeg[i] != 0xFF || jpeg[i + 1] != 0xDB || (jpeg[i + 4] & 0xF0) != 0) continue;
        std::vector<int> q(jpeg.begin() + i + 5, jpeg.begin() + i + 5 + 64);
        std::sort(q.begin(), q.end());
        return q;
    }
    return {};
}
inline std::vector<int> lumaTableForQuality(int quality) {
    static const int base[64] = {16,  11,  10,  16,  24, 40, 51,  61,  12,  12,  14,  19,  26,
                                 58,  60,  55,  14,  13, 16, 24,  40,  57,  69,  56,  14,  17,
                                 22,  29,  51,  87,  80, 62, 18,  22,  37,  56,  68,  109, 103,
                                 77,  24,  35,  55,  64, 81, 104, 113, 92,  49,  64,  78,  87,
                                 103, 121, 120, 101, 72, 92, 95,  98,  112, 100, 103, 99};
    const int scale = quality < 50 ? 5000 / quality : 200 - quality * 2;
    std::vector<int> q(64);
    for (int i = 0; i < 64; ++i) q[i] = std::min(std::max((base[i] * scale + 50) / 100, 1), 255);
    std::sort(q.begin(), q.end());
    return q;
}

// Offset of the first byte after a marker's two bytes, or 0.
inline size_t findMarker(const Bytes& jpeg, unsigned char marker) {
    for (size_t i = 2; i + 1 < jpeg.size(); ++i)
        if (jpeg[i] == 0xFF && jpeg[i + 1] == marker) return i + 2;
    return 0;
}

// PNG chunk checksum (CRC-32, reflected polynomial 0xEDB88320).
inline uint32_t crc32Of(const unsigned char* p, size_t n) {
    uint32_t crc = 0xFFFFFFFFu;
    for (size_t i = 0; i < n; ++i) {
        crc ^= p[i];
        for (int k = 0; k < 8; ++k) crc = (crc >> 1) ^ (0xEDB88320u & (0u - (crc & 1u)));
    }
    return crc ^ 0xFFFFFFFFu;
}

// A well-formed 1×1 PNG whose header is rewritten to declare width×height.
inline Bytes pngDeclaring(uint32_t width, uint32_t height) {
    PngPicture tiny;
    tiny.samples = {1, 2, 3, 4};
    Bytes png = makePng(tiny);
    auto put = [&](size_t at, uint32_t v) {
        for (int k = 0; k < 4; ++k) png[at + k] = static_cast<unsigned char>(v >> (24 - 8 * k));
    };
    put(16, width);
    put(20, height);
    put(29, crc32Of(&png[12], 17));  // over the chunk type and header fields
    return png;
}

// A JPEG stream whose frame header is rewritten to declare width×height.
inline Bytes jpegDeclaring(Bytes jpeg, int width, int height) {
    size_t sof = findMarker(jpeg, 0xC0);
    if (sof == 0) return Bytes();
    jpeg[sof + 3] = static_cast<unsigned char>(height >> 8);
    jpeg[sof + 4] = static_cast<unsigned char>(height);
    jpeg[sof + 5] = static_cast<unsigned char>(width >> 8);
    jpeg[sof + 6] = static_cast<unsigned char>(width);
    return jpeg;
}

}  // namespace kivtest

#endif
