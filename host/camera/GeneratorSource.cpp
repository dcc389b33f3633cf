// The generator's frames: eight colour bars that move a step each frame,
// the frame index as a binary code across the top (one guard block that is
// always white, kCodeBits bits most significant first, one guard block that
// is always black) and, below it, the index in digits on a black strip. The
// code and the strip are grey (neutral chroma), so they read back the same
// after any YUV conversion.
#include <stdio.h>
#include <string.h>

#include <algorithm>
#include <vector>

#include "kivhost/VirtualCamera.h"
#include "vccore/vc_convert.h"

namespace kivhost {

namespace {

const int kCodeBits = 20;
const int kCodeBlocks = kCodeBits + 2;

// 3x5 digits, one row of three bits (left first) a line.
const uint8_t kDigits[10][5] = {
    {7, 5, 5, 5, 7}, {2, 6, 2, 2, 7}, {7, 1, 7, 4, 7}, {7, 1, 7, 1, 7}, {5, 5, 7, 1, 1},
    {7, 4, 7, 1, 7}, {7, 4, 7, 5, 7}, {7, 1, 1, 1, 1}, {7, 5, 7, 5, 7}, {7, 5, 7, 1, 7},
};

int codeHeight(int height) {
    return std::max(2, (height / 8) & ~1);
}

class Generator : public VirtualCameraSource {
public:
    Generator(int width, int height) : mWidth(width), mHeight(height) {
        // The bar colours in YUV as the image core converts them.
        const uint8_t rgb[8][3] = {{255, 255, 255}, {255, 255, 0}, {0, 255, 255}, {0, 255, 0},
                                   {255, 0, 255},   {255, 0, 0},   {0, 0, 255},   {0, 0, 0}};
        uint8_t rgba[16 * 2 * 4];
        for (int y = 0; y < 2; ++y) {
            for (int x = 0; x < 16; ++x) {
                uint8_t* p = rgba + (y * 16 + x) * 4;
                memcpy(p, rgb[x / 2], 3);
                p[3] = 255;
            }
        }
        uint8_t nv21[16 * 2 * 3 / 2];
        VCImage in, out;
        in.data = rgba;
        out.data = nv21;
        in.width = out.width = 16;
        in.height = out.height = 2;
        in.format = VC_FORMAT_RGBA;
        out.format = VC_FORMAT_NV21;
        in.wrapped = out.wrapped = 1;
        VCImage_convert(&in, &out);
        // Patterns twice the width: a moved row is a window into them.
        mLuma.resize((size_t)width * 2);
        mChroma.resize((size_t)width * 2);
        for (int x = 0; x < 2 * width; ++x) {
            const int bar = (x % width) * 8 / width;
            mLuma[x] = nv21[bar * 2];
            mChroma[x] = nv21[32 + bar * 2 + (x & 1)];  // V, U
        }
    }

    bool render(uint64_t index, VCImage* frame) override {
        const int w = mWidth, h = mHeight;
        unsigned char* luma = frame->data;
        unsigned char* chroma = frame->data + (size_t)w * h;
        const int step = std::max(2, (w / 64) & ~1);
        const int offset = (int)((index * step) % (uint64_t)w) & ~1;
        for (int y = 0; y < h; ++y) memcpy(luma + (size_t)y * w, &mLuma[offset], w);
        for (int y = 0; y < h / 2; ++y) memcpy(chroma + (size_t)y * w, &mChroma[offset], w);

        const int codeH = codeHeight(h);
        for (int block = 0; block < kCodeBlocks; ++block) {
            const int bit = block - 1;
            const bool white =
                block == 0 || (bit < kCodeBits && ((index >> (kCodeBits - 1 - bit)) & 1) != 0);
            const int x0 = block * w / kCodeBlocks, x1 = (block + 1) * w / kCodeBlocks;
            for (int y = 0; y < codeH; ++y)
                memset(luma + (size_t)y * w + x0, white ? 255 : 0, x1 - x0);
        }
        // The digits, scaled with the frame, on a black strip.
        const int scale = std::max(1, codeH / 4);
        const int stripH = (5 * scale + 2 * scale + 1) & ~1;
        const int bottom = std::min(h, codeH + stripH);
        for (int y = codeH; y < bottom; ++y) memset(luma + (size_t)y * w, 0, w);
        memset(chroma, 128, (size_t)w * (bottom / 2));
        char digits[24];
        const int count = snprintf(digits, sizeof(digits), "%llu", (unsigned long long)index);
        for (int d = 0; d < count; ++d) {
            const uint8_t* glyph = kDigits[digits[d] - '0'];
            for (int row = 0; row < 5; ++row) {
                for (int col = 0; col < 3; ++col) {
                    if (((glyph[row] >> (2 - col)) & 1) == 0) continue;
                    for (int dy = 0; dy < scale; ++dy) {
                        const int y = codeH + scale + row * scale + dy;
                        const int x = scale + (d * 4 + col) * scale;
                        if (y >= bottom || x + scale > w) continue;
                        memset(luma + (size_t)y * w + x, 255, scale);
                    }
                }
            }
        }
        return true;
    }

private:
    const int mWidth;
    const int mHeight;
    std::vector<unsigned char> mLuma;
    std::vector<unsigned char> mChroma;
};

}  // namespace

std::unique_ptr<VirtualCameraSource> VirtualCamera_generator(int width, int height) {
    if (width < 2 || height < 2 || (width & 1) != 0 || (height & 1) != 0) return nullptr;
    return std::unique_ptr<VirtualCameraSource>(new Generator(width, height));
}

int64_t VirtualCamera_decodeFrameNumber(const uint8_t* rgba, int width, int height, bool bottomUp) {
    if (rgba == nullptr || width < kCodeBlocks || height < 2) return -1;
    const int y = codeHeight(height) / 2;
    const int row = bottomUp ? height - 1 - y : y;
    int64_t value = 0;
    for (int block = 0; block < kCodeBlocks; ++block) {
        const int x = (2 * block + 1) * width / (2 * kCodeBlocks);
        const uint8_t* p = rgba + ((size_t)row * width + x) * 4;
        const bool white = (p[0] + p[1] + p[2]) / 3 > 127;
        if (block == 0 || block == kCodeBlocks - 1) {
            if (white != (block == 0)) return -1;
        } else {
            value = (value << 1) | (white ? 1 : 0);
        }
    }
    return value;
}

}  // namespace kivhost
