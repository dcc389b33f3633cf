// Owning handle for VCImage records, and deterministic test pictures.
#ifndef KIV_TESTS_VC_IMAGE_HANDLE_H
#define KIV_TESTS_VC_IMAGE_HANDLE_H

#include <stdint.h>

#include <memory>
#include <random>
#include <string>
#include <vector>

#include "vccore/vc_image.h"

struct VCImageDeleter {
    void operator()(VCImage* image) const { VCImage_destroy(image); }
};
using VCImageHandle = std::unique_ptr<VCImage, VCImageDeleter>;

// A new owning image whose bytes come from a generator seeded with seed; null
// when the format has no size at that geometry.
inline VCImageHandle VCImageTest_random(int width, int height, uint32_t format, uint32_t seed) {
    VCImageHandle image(VCImage_createNew(width, height, format));
    if (image == nullptr) return image;
    std::mt19937 rng(seed);
    for (uint32_t i = 0; i < image->size; ++i) image->data[i] = static_cast<uint8_t>(rng());
    return image;
}

// The bytes of an image's buffer (its size field, or the geometry's size).
inline std::vector<uint8_t> VCImageTest_bytes(const VCImage& image) {
    if (image.data == nullptr) return {};
    return std::vector<uint8_t>(image.data, image.data + VCImage_size(&image));
}

inline std::string VCImageTest_fourcc(uint32_t format) {
    return std::string(reinterpret_cast<const char*>(&format), 4);
}

#endif
