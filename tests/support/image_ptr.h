// The owning handle of a VCImage in tests (destroyed at the end of its scope,
// also when an assertion returns early) and the few helpers every image suite
// uses.
#ifndef KIV_TESTS_SUPPORT_IMAGE_PTR_H
#define KIV_TESTS_SUPPORT_IMAGE_PTR_H

#include <stdint.h>
#include <stdio.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <memory>
#include <random>
#include <string>
#include <tuple>
#include <vector>

#include "vccore/vc_image.h"

// Short format names for tables of cases.
namespace fourcc {
constexpr uint32_t RGBA = VC_FORMAT_RGBA, BGRA = VC_FORMAT_BGRA, ARGB = VC_FORMAT_ARGB,
                   ABGR = VC_FORMAT_ABGR, RGB8 = VC_FORMAT_RGB8, BGR8 = VC_FORMAT_BGR8,
                   GREY = VC_FORMAT_GREY, YUYV = VC_FORMAT_YUYV, YVYU = VC_FORMAT_YVYU,
                   NV12 = VC_FORMAT_NV12, NV21 = VC_FORMAT_NV21, YV12 = VC_FORMAT_YV12,
                   YUVP = VC_FORMAT_YUVP, JPEG = VC_FORMAT_JPEG;
}  // namespace fourcc

struct ImageDeleter {
    void operator()(VCImage* image) const { VCImage_destroy(image); }
};
using ImagePtr = std::unique_ptr<VCImage, ImageDeleter>;

inline ImagePtr VCImageTest_wrap(void* data, int w, int h, uint32_t format, int size = 0,
                                 uint32_t uvOffset = 0) {
    return ImagePtr(
        VCImage_createWrap(static_cast<unsigned char*>(data), w, h, format, size, uvOffset));
}

// A new owning image whose bytes come from a generator seeded with seed; null
// when the format has no size at that geometry.
inline ImagePtr VCImageTest_random(int width, int height, uint32_t format, uint32_t seed) {
    ImagePtr image(VCImage_createNew(width, height, format));
    std::mt19937 rng(seed);
    for (uint32_t i = 0; image != nullptr && i < image->size; ++i)
        image->data[i] = static_cast<uint8_t>(rng());
    return image;
}

inline std::vector<uint8_t> VCImageTest_randomBytes(size_t n, uint32_t seed) {
    std::mt19937 rng(seed);
    std::vector<uint8_t> out(n);
    for (uint8_t& b : out) b = static_cast<uint8_t>(rng());
    return out;
}

// The bytes of an image's buffer (its size field, or the geometry's size).
inline std::vector<uint8_t> VCImageTest_bytes(const VCImage& image) {
    if (image.data == nullptr) return {};
    return std::vector<uint8_t>(image.data, image.data + VCImage_size(&image));
}

inline std::string VCImageTest_fourcc(uint32_t format) {
    return std::string(reinterpret_cast<const char*>(&format), 4);
}

// The largest difference between two byte vectors, 256 when their sizes differ.
inline int VCImageTest_maxDifference(const std::vector<uint8_t>& a, const std::vector<uint8_t>& b) {
    if (a.size() != b.size() || a.empty()) return 256;
    int worst = 0;
    for (size_t i = 0; i < a.size(); ++i) worst = std::max(worst, std::abs(a[i] - b[i]));
    return worst;
}

// The name of a generated check for a (source, target) format pair: "RGBA_NV21".
using FormatPair = std::tuple<uint32_t, uint32_t>;
inline std::string VCImageTest_pairName(const ::testing::TestParamInfo<FormatPair>& info) {
    return VCImageTest_fourcc(std::get<0>(info.param)) + "_" +
           VCImageTest_fourcc(std::get<1>(info.param));
}

// Every field of a record but the data pointer, to compare states in one line.
inline std::string VCImageTest_record(const VCImage* image) {
    if (image == nullptr) return "null";
    char text[128];
    snprintf(text, sizeof(text), "%dx%d %4.4s%s wrapped %d size %u uv %u", image->width,
             image->height, reinterpret_cast<const char*>(&image->format),
             image->data != nullptr ? "" : " no data", image->wrapped, image->size,
             image->uvOffset);
    return text;
}

#endif
