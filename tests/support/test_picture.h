// The one test picture: smooth gradients (as a camera frame) with sharp-edged
// blocks and flat black, white and grey patches, alpha varying unless opaque.
#ifndef KIV_TESTS_SUPPORT_TEST_PICTURE_H
#define KIV_TESTS_SUPPORT_TEST_PICTURE_H

#include <stdint.h>

#include <algorithm>
#include <cmath>
#include <vector>

namespace kivtest {

inline std::vector<uint8_t> makeTestPicture(int width, int height, bool opaque) {
    std::vector<uint8_t> px(static_cast<size_t>(width) * height * 4);
    for (int y = 0; y < height; ++y) {
        for (int x = 0; x < width; ++x) {
            uint8_t* p = &px[(static_cast<size_t>(y) * width + x) * 4];
            float u = (x + 0.5f) / width, v = (y + 0.5f) / height;
            int r = static_cast<int>(255 * u);
            int g = static_cast<int>(255 * v);
            int b = static_cast<int>(255 * (0.5f + 0.5f * std::sin(6.0f * u + 4.0f * v)));
            // Sharp-edged blocks: strong edges for the edge detectors.
            if (((x / 8) + (y / 8)) % 5 == 0) {
                r = 255 - r;
                b = (b + 128) % 256;
            }
            if (x < width / 8 && y < height / 8) r = g = b = 0;
            if (x >= width - width / 8 && y < height / 8) r = g = b = 255;
            if (x < width / 8 && y >= height - height / 8) r = g = b = 128;
            p[0] = static_cast<uint8_t>(r);
            p[1] = static_cast<uint8_t>(g);
            p[2] = static_cast<uint8_t>(b);
            p[3] = opaque ? 255 : static_cast<uint8_t>(128 + (x * 127) / std::max(width - 1, 1));
        }
    }
    return px;
}

}  // namespace kivtest

#endif
