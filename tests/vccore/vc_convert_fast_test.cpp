// The vector conversion paths against the double-precision equations (every
// possible input) and against the reference loops (random images, every
// vector pair).
#include <gtest/gtest.h>
#include <string.h>

#include <random>
#include <tuple>
#include <vector>

#include "support/colour_model.h"
#include "support/image_ptr.h"
#include "vc_image_convert_fast.h"
#include "vc_image_layout.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_log.h"

namespace {

using Bytes = std::vector<uint8_t>;

void quietLog(int, const char*, ...) {}

// Keeps the hardware-library and debug lines out of the big loops.
struct Quiet {
    Quiet() : mPrevious(VF_LogMsg) { VF_LogMsg = quietLog; }
    ~Quiet() {
        VF_LogMsg = mPrevious;
        VCConvert_setLevel(VCConvert_cpuLevel());
    }
    VF_LogMsg_t mPrevious;
};

std::vector<int> vectorLevels() {
    std::vector<int> out;
    for (int level = kVCConvertSse2; level <= VCConvert_cpuLevel(); ++level) out.push_back(level);
    return out;
}

// 4096 x 4096 pixels: every (U, V) pair owns 64 chroma blocks of four pixels,
// which between them carry all 256 luma values. The reference's own integer
// model is checked over the same triples.
TEST(VCConvertFast, YuvToRgbEqualsDoubleForAllTriples) {
    Quiet quiet;
    const int w = 4096, h = 4096;
    const size_t luma = static_cast<size_t>(w) * h;
    Bytes yuv(luma * 3 / 2), rgba(luma * 4);
    for (int cy = 0; cy < h / 2; ++cy)
        for (int cx = 0; cx < w / 2; ++cx) {
            const uint32_t k = static_cast<uint32_t>(cy) * (w / 2) + cx, uv = k / 64;
            const int base = static_cast<int>(k % 64) * 4;
            uint8_t* y0 = yuv.data() + static_cast<size_t>(2 * cy) * w + 2 * cx;
            y0[0] = base, y0[1] = base + 1, y0[w] = base + 2, y0[w + 1] = base + 3;
            uint8_t* c = yuv.data() + luma + static_cast<size_t>(cy) * w + 2 * cx;
            c[0] = uv & 0xff, c[1] = uv >> 8;
        }
    long scalarMismatches = 0;
    for (int y = 0; y < 256; ++y)
        for (uint32_t uv = 0; uv < 65536; ++uv) {
            int want[3];
            colour::yuvToRgb(y, uv & 0xff, uv >> 8, want);
            uint8_t r, g, b;
            VCConvert_yuvToRgbFixed(y, uv & 0xff, uv >> 8, &r, &g, &b);
            scalarMismatches += r != want[0] || g != want[1] || b != want[2];
        }
    EXPECT_EQ(0, scalarMismatches);
    for (uint32_t format : {VC_FORMAT_NV12, VC_FORMAT_NV21}) {
        ImagePtr src = VCImageTest_wrap(yuv.data(), w, h, format, static_cast<int>(yuv.size()));
        ImagePtr dst =
            VCImageTest_wrap(rgba.data(), w, h, VC_FORMAT_RGBA, static_cast<int>(rgba.size()));
        for (int level : vectorLevels()) {
            ASSERT_EQ(level, VCConvert_setLevel(level));
            memset(rgba.data(), 0, rgba.size());
            // Straight into the vector path: a fallback must not pass for it.
            ASSERT_TRUE(VCConvert_fast(src.get(), dst.get()));
            long mismatches = 0;
            for (int y = 0; y < h; ++y) {
                const uint8_t* c = yuv.data() + luma + static_cast<size_t>(y / 2) * w;
                for (int x = 0; x < w; ++x) {
                    const int first = c[x & ~1], second = c[(x & ~1) + 1];
                    int want[3];
                    colour::yuvToRgb(yuv[static_cast<size_t>(y) * w + x],
                                     format == VC_FORMAT_NV12 ? first : second,
                                     format == VC_FORMAT_NV12 ? second : first, want);
                    const uint8_t* px = rgba.data() + (static_cast<size_t>(y) * w + x) * 4;
                    mismatches +=
                        px[0] != want[0] || px[1] != want[1] || px[2] != want[2] || px[3] != 255;
                }
            }
            EXPECT_EQ(0, mismatches) << "level " << level;
        }
    }
}

TEST(VCConvertFast, RgbToYuvEqualsTheEquationsForAllTriples) {
    Quiet quiet;
    const int w = 4096, h = 4096;
    const size_t luma = static_cast<size_t>(w) * h;
    Bytes rgba(luma * 4), nv12(luma * 3 / 2);
    ImagePtr src =
        VCImageTest_wrap(rgba.data(), w, h, VC_FORMAT_RGBA, static_cast<int>(rgba.size()));
    ImagePtr dst =
        VCImageTest_wrap(nv12.data(), w, h, VC_FORMAT_NV12, static_cast<int>(nv12.size()));
    for (int level : vectorLevels()) {
        ASSERT_EQ(level, VCConvert_setLevel(level));
        // Four passes move every colour through the chroma-giving corner of a block once.
        for (int pass = 0; pass < 4; ++pass) {
            for (int y = 0; y < h; ++y)
                for (int x = 0; x < w; ++x) {
                    const uint32_t t =
                        static_cast<uint32_t>(y ^ (pass >> 1)) * w + (x ^ (pass & 1));
                    uint8_t* px = rgba.data() + (static_cast<size_t>(y) * w + x) * 4;
                    px[0] = t, px[1] = t >> 8, px[2] = t >> 16, px[3] = pass;
                }
            ASSERT_TRUE(VCConvert_fast(src.get(), dst.get()));
            long mismatches = 0;
            for (int y = 0; y < h; ++y)
                for (int x = 0; x < w; ++x) {
                    const uint8_t* px = rgba.data() + (static_cast<size_t>(y) * w + x) * 4;
                    const int yy = colour::luma(px[0], px[1], px[2]);
                    mismatches += nv12[static_cast<size_t>(y) * w + x] != yy;
                    if (x % 2 != 0 || y % 2 != 0) continue;
                    const uint8_t* c = nv12.data() + luma + static_cast<size_t>(y / 2) * w + x;
                    mismatches += c[0] != colour::chromaU(px[2], yy);
                    mismatches += c[1] != colour::chromaV(px[0], yy);
                }
            EXPECT_EQ(0, mismatches) << "level " << level << " pass " << pass;
        }
    }
}

// Converts with the reference loops and with one vector level into buffers
// of exactly the needed size, pre-filled alike, and compares every byte.
// About one chroma pair in eight, and the first and last of every chroma row,
// is the pair the vector paths redo in scalar (random bytes would not hold it).
// dstShift moves the destination off the allocator's alignment.
void compareLevels(uint32_t sf, uint32_t df, int w, int h, uint32_t srcOffset, uint32_t dstOffset,
                   int level, unsigned seed, size_t dstShift = 0) {
    const size_t luma = static_cast<size_t>(w) * h;
    auto bytesFor = [&](uint32_t format, uint32_t offset) {
        return offset != 0 ? offset + luma / 2 : VCImage_requiredSize(w, h, format);
    };
    const size_t srcBytes = bytesFor(sf, srcOffset), dstBytes = bytesFor(df, dstOffset);
    std::mt19937 rng(seed);
    Bytes src = VCImageTest_randomBytes(srcBytes, seed), ref(dstBytes + dstShift), fast(ref.size());
    ImagePtr in = VCImageTest_wrap(src.data(), w, h, sf, static_cast<int>(srcBytes), srcOffset);
    VCYuvLayout l;
    if (VCImage_isYUV420(sf) && VCImage_yuvLayout(in.get(), &l))
        for (int row = 0; row < h / 2; ++row)
            for (int k = 0; k < w / 2; ++k) {
                if (k != 0 && k != w / 2 - 1 && rng() % 8 != 0) continue;
                const size_t i = (static_cast<size_t>(row) * (w / 2) + k) * l.chromaStep;
                src[l.uOffset + i] = kVCConvertGFixU;
                src[l.vOffset + i] = kVCConvertGFixV;
            }
    ImagePtr outRef =
        VCImageTest_wrap(ref.data() + dstShift, w, h, df, static_cast<int>(dstBytes), dstOffset);
    ImagePtr outFast =
        VCImageTest_wrap(fast.data() + dstShift, w, h, df, static_cast<int>(dstBytes), dstOffset);
    VCConvert_setLevel(kVCConvertScalar);
    ASSERT_EQ(VC_OK, VCImage_convert(in.get(), outRef.get()));
    ASSERT_EQ(level, VCConvert_setLevel(level));
    ASSERT_TRUE(VCConvert_fast(in.get(), outFast.get()));
    EXPECT_TRUE(ref == fast) << VCImageTest_fourcc(sf) << " -> " << VCImageTest_fourcc(df) << " "
                             << w << "x" << h << " offsets " << srcOffset << "/" << dstOffset
                             << " shift " << dstShift << " level " << level;
}

const uint32_t kRgb32[] = {VC_FORMAT_RGBA, VC_FORMAT_BGRA, VC_FORMAT_ARGB, VC_FORMAT_ABGR};
const uint32_t kYuv420[] = {VC_FORMAT_NV12, VC_FORMAT_NV21, VC_FORMAT_YV12, VC_FORMAT_YUVP};

class VectorPair : public ::testing::TestWithParam<std::tuple<uint32_t, uint32_t>> {};

// Sizes around every vector width and tail, contiguous and displaced chroma;
// RGB orders also at odd sizes.
TEST_P(VectorPair, MatchesTheReference) {
    Quiet quiet;
    const uint32_t sf = std::get<0>(GetParam()), df = std::get<1>(GetParam());
    const bool rgb = VCImage_isRGB(sf) && VCImage_isRGB(df);
    const int even[][2] = {{2, 2},  {6, 4},  {14, 2}, {16, 2}, {30, 6},  {32, 4},   {34, 2},
                           {62, 4}, {64, 2}, {66, 6}, {96, 2}, {998, 4}, {1000, 6}, {1026, 2}};
    const int odd[][2] = {{1, 1}, {3, 5}, {9, 3}, {33, 7}, {1001, 3}};
    unsigned seed = sf ^ df;
    for (int level : vectorLevels()) {
        for (const auto& s : even)
            for (uint32_t off : {0u, rgb ? 0u : static_cast<uint32_t>(s[0] * s[1] + 40)})
                compareLevels(sf, df, s[0], s[1], VCImage_isYUV420(sf) ? off : 0,
                              VCImage_isYUV420(df) ? off : 0, level, seed++);
        for (const auto& s : odd)
            if (rgb) compareLevels(sf, df, s[0], s[1], 0, 0, level, seed++);
    }
}

std::vector<std::tuple<uint32_t, uint32_t>> vectorPairs() {
    std::vector<std::tuple<uint32_t, uint32_t>> out;
    for (uint32_t a : kRgb32) {
        for (uint32_t y : kYuv420) out.emplace_back(y, a), out.emplace_back(a, y);
        for (uint32_t b : kRgb32)
            if (a != b) out.emplace_back(a, b);
    }
    return out;
}

INSTANTIATE_TEST_SUITE_P(Pairs, VectorPair, ::testing::ValuesIn(vectorPairs()),
                         VCImageTest_pairName);

// Calls that move 12 MiB and more write whole 64-byte lines with streaming
// stores after a head that reaches the first line: shifting the destination
// by 4 bytes leaves 4:2:0 sources no even pixel count to get there (plain
// stores), by 8 gives another head; 2000 pixels leave a partial block per
// row; rows of 16008 bytes never align alike in a pair.
TEST(VCConvertFast, LargeOutputsMatchTheReference) {
    Quiet quiet;
    unsigned seed = 900;
    for (int level : vectorLevels()) {
        for (size_t shift : {0, 4, 8}) {
            compareLevels(VC_FORMAT_RGBA, VC_FORMAT_BGRA, 4096, 2050, 0, 0, level, seed++, shift);
            compareLevels(VC_FORMAT_NV21, VC_FORMAT_ABGR, 4096, 2050, 0, 0, level, seed++, shift);
            compareLevels(VC_FORMAT_NV12, VC_FORMAT_RGBA, 2000, 1200, 0, 0, level, seed++, shift);
        }
        compareLevels(VC_FORMAT_YV12, VC_FORMAT_RGBA, 4002, 2100, 0, 0, level, seed++);
    }
}

TEST(VCConvertFast, LevelsAreCappedByTheCpu) {
    const int cpu = VCConvert_cpuLevel();
    EXPECT_EQ(kVCConvertScalar, VCConvert_setLevel(-5));
    EXPECT_EQ(kVCConvertScalar, VCConvert_level());
    EXPECT_EQ(cpu, VCConvert_setLevel(99));
    EXPECT_EQ(cpu, VCConvert_level());
#if defined(__x86_64__)
    EXPECT_EQ(__builtin_cpu_supports("avx2") ? kVCConvertAvx2 : kVCConvertSse2, cpu);
#endif
}

}  // namespace
