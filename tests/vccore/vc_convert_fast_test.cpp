// The vector conversion paths against the double-precision equations (every
// possible input) and against the reference loops (random images).
#include <gtest/gtest.h>
#include <string.h>

#include <random>
#include <vector>

#include "vc_image_convert_fast.h"
#include "vc_image_layout.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_log.h"

namespace {

void quietLog(int, const char*, ...) {}

// Keeps the hardware-library lines and debug lines out of the big loops.
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

using Bytes = std::vector<uint8_t>;

int clampTo8(int v) {
    return v < 0 ? 0 : (v > 255 ? 255 : v);
}

void doubleRgb(int y, int u, int v, int out[3]) {
    out[0] = clampTo8(static_cast<int>(y + 1.402 * (v - 128)));
    out[1] = clampTo8(static_cast<int>(y - 0.34414 * (u - 128) - 0.71414 * (v - 128)));
    out[2] = clampTo8(static_cast<int>(y + 1.772 * (u - 128)));
}

}  // namespace

TEST(VCConvertFast, IntegerModelEqualsDoubleForAllTriples) {
    long mismatches = 0;
    for (int u = 0; u < 256; ++u) {
        for (int v = 0; v < 256; ++v) {
            for (int y = 0; y < 256; ++y) {
                int want[3];
                doubleRgb(y, u, v, want);
                uint8_t r, g, b;
                VCConvert_yuvToRgbFixed(y, u, v, &r, &g, &b);
                if (r != want[0] || g != want[1] || b != want[2]) ++mismatches;
            }
        }
    }
    EXPECT_EQ(0, mismatches);
    // Without its correction the model would be wrong for that one pair.
    uint8_t r, g, b;
    VCConvert_yuvToRgbFixed(100, kVCConvertGFixU, kVCConvertGFixV, &r, &g, &b);
    int want[3];
    doubleRgb(100, kVCConvertGFixU, kVCConvertGFixV, want);
    EXPECT_EQ(want[1], g);
    EXPECT_EQ(100 - 37 - 1, g);
}

TEST(VCConvertFast, YuvToRgbKernelsEqualDoubleForAllTriples) {
    Quiet quiet;
    // 4096 x 4096 pixels: every (U, V) pair owns 64 chroma blocks of four
    // pixels, which between them carry all 256 luma values.
    const int w = 4096, h = 4096;
    const size_t luma = static_cast<size_t>(w) * h;
    Bytes yuv(luma * 3 / 2);
    for (int cy = 0; cy < h / 2; ++cy) {
        for (int cx = 0; cx < w / 2; ++cx) {
            const uint32_t k = static_cast<uint32_t>(cy) * (w / 2) + cx;
            const uint32_t uv = k / 64;
            const int base = static_cast<int>(k % 64) * 4;
            uint8_t* y0 = yuv.data() + static_cast<size_t>(2 * cy) * w + 2 * cx;
            y0[0] = static_cast<uint8_t>(base);
            y0[1] = static_cast<uint8_t>(base + 1);
            y0[w] = static_cast<uint8_t>(base + 2);
            y0[w + 1] = static_cast<uint8_t>(base + 3);
            uint8_t* c = yuv.data() + luma + static_cast<size_t>(cy) * w + 2 * cx;
            c[0] = static_cast<uint8_t>(uv & 0xff);
            c[1] = static_cast<uint8_t>(uv >> 8);
        }
    }
    Bytes rgba(luma * 4);
    for (uint32_t format : {VC_FORMAT_NV12, VC_FORMAT_NV21}) {
        VCImage* src =
            VCImage_createWrap(yuv.data(), w, h, format, static_cast<int>(yuv.size()), 0);
        VCImage* dst =
            VCImage_createWrap(rgba.data(), w, h, VC_FORMAT_RGBA, static_cast<int>(rgba.size()), 0);
        for (int level : vectorLevels()) {
            ASSERT_EQ(level, VCConvert_setLevel(level));
            memset(rgba.data(), 0, rgba.size());
            // Straight into the vector path: a fallback to the reference
            // loops must not pass for it.
            ASSERT_TRUE(VCConvert_fast(src, dst));
            long mismatches = 0;
            for (int y = 0; y < h; ++y) {
                const uint8_t* c = yuv.data() + luma + static_cast<size_t>(y / 2) * w;
                for (int x = 0; x < w; ++x) {
                    const int first = c[x & ~1], second = c[(x & ~1) + 1];
                    const int u = format == VC_FORMAT_NV12 ? first : second;
                    const int v = format == VC_FORMAT_NV12 ? second : first;
                    int want[3];
                    doubleRgb(yuv[static_cast<size_t>(y) * w + x], u, v, want);
                    const uint8_t* px = rgba.data() + (static_cast<size_t>(y) * w + x) * 4;
                    if (px[0] != want[0] || px[1] != want[1] || px[2] != want[2] || px[3] != 255)
                        ++mismatches;
                }
            }
            EXPECT_EQ(0, mismatches) << "level " << level;
        }
        VCImage_destroy(src);
        VCImage_destroy(dst);
    }
}

TEST(VCConvertFast, RgbToYuvKernelsEqualTheEquationsForAllTriples) {
    Quiet quiet;
    const int w = 4096, h = 4096;
    const size_t luma = static_cast<size_t>(w) * h;
    Bytes rgba(luma * 4);
    Bytes nv12(luma * 3 / 2);
    for (int level : vectorLevels()) {
        ASSERT_EQ(level, VCConvert_setLevel(level));
        // Four passes move every colour through the chroma-giving corner of
        // a 2 x 2 block once.
        for (int pass = 0; pass < 4; ++pass) {
            for (int y = 0; y < h; ++y) {
                for (int x = 0; x < w; ++x) {
                    const uint32_t t =
                        static_cast<uint32_t>(y ^ (pass >> 1)) * w + (x ^ (pass & 1));
                    uint8_t* px = rgba.data() + (static_cast<size_t>(y) * w + x) * 4;
                    px[0] = static_cast<uint8_t>(t);
                    px[1] = static_cast<uint8_t>(t >> 8);
                    px[2] = static_cast<uint8_t>(t >> 16);
                    px[3] = static_cast<uint8_t>(pass);
                }
            }
            VCImage* src = VCImage_createWrap(rgba.data(), w, h, VC_FORMAT_RGBA,
                                              static_cast<int>(rgba.size()), 0);
            VCImage* dst = VCImage_createWrap(nv12.data(), w, h, VC_FORMAT_NV12,
                                              static_cast<int>(nv12.size()), 0);
            ASSERT_TRUE(VCConvert_fast(src, dst));
            long mismatches = 0;
            for (int y = 0; y < h; ++y) {
                for (int x = 0; x < w; ++x) {
                    const uint8_t* px = rgba.data() + (static_cast<size_t>(y) * w + x) * 4;
                    const int r = px[0], g = px[1], b = px[2];
                    const int yy = clampTo8((19595 * r + 38470 * g + 7471 * b) >> 16);
                    if (nv12[static_cast<size_t>(y) * w + x] != yy) ++mismatches;
                    if (x % 2 != 0 || y % 2 != 0) continue;
                    const uint8_t* c = nv12.data() + luma + static_cast<size_t>(y / 2) * w + x;
                    if (c[0] != clampTo8(((36962 * (b - yy)) >> 16) + 128)) ++mismatches;
                    if (c[1] != clampTo8(((46727 * (r - yy)) >> 16) + 128)) ++mismatches;
                }
            }
            EXPECT_EQ(0, mismatches) << "level " << level << " pass " << pass;
            VCImage_destroy(src);
            VCImage_destroy(dst);
        }
    }
}

namespace {

struct Size {
    int w, h;
};

// Sets about one chroma pair in eight of a 4:2:0 image, and the first and
// last pair of every chroma row, to the pair the vector paths redo in scalar
// (random bytes would almost never hold it).
void plantSpecialPairs(VCImage* image, std::mt19937& rng) {
    VCYuvLayout l;
    ASSERT_TRUE(VCImage_yuvLayout(image, &l));
    const int half = image->width / 2;
    for (int row = 0; row < image->height / 2; ++row) {
        for (int k = 0; k < half; ++k) {
            if (k != 0 && k != half - 1 && rng() % 8 != 0) continue;
            const size_t i = (static_cast<size_t>(row) * half + k) * l.chromaStep;
            image->data[l.uOffset + i] = kVCConvertGFixU;
            image->data[l.vOffset + i] = kVCConvertGFixV;
        }
    }
}

// Converts with the reference loops and with one vector level into buffers
// of exactly the needed size, pre-filled alike, and compares every byte.
void compareLevels(uint32_t sf, uint32_t df, Size s, uint32_t srcOffset, uint32_t dstOffset,
                   int level, unsigned seed, size_t dstShift = 0) {
    const size_t luma = static_cast<size_t>(s.w) * s.h;
    auto bytesFor = [&](uint32_t format, uint32_t offset) {
        const size_t req = VCImage_requiredSize(s.w, s.h, format);
        return offset != 0 ? offset + luma / 2 : req;
    };
    const size_t srcBytes = bytesFor(sf, srcOffset);
    const size_t dstBytes = bytesFor(df, dstOffset);
    std::mt19937 rng(seed);
    Bytes src(srcBytes);
    for (size_t i = 0; i < srcBytes; ++i) src[i] = static_cast<uint8_t>(rng());
    // dstShift moves the destination off the allocator's alignment.
    Bytes ref(dstBytes + dstShift), fast(dstBytes + dstShift);

    VCImage* in =
        VCImage_createWrap(src.data(), s.w, s.h, sf, static_cast<int>(srcBytes), srcOffset);
    if (VCImage_isYUV420(sf)) plantSpecialPairs(in, rng);
    VCImage* outRef = VCImage_createWrap(ref.data() + dstShift, s.w, s.h, df,
                                         static_cast<int>(dstBytes), dstOffset);
    VCImage* outFast = VCImage_createWrap(fast.data() + dstShift, s.w, s.h, df,
                                          static_cast<int>(dstBytes), dstOffset);
    VCConvert_setLevel(kVCConvertScalar);
    ASSERT_EQ(VC_OK, VCImage_convert(in, outRef));
    ASSERT_EQ(level, VCConvert_setLevel(level));
    ASSERT_TRUE(VCConvert_fast(in, outFast));
    const std::string what = std::string(reinterpret_cast<const char*>(&sf), 4) + " -> " +
                             std::string(reinterpret_cast<const char*>(&df), 4) + " " +
                             std::to_string(s.w) + "x" + std::to_string(s.h) + " offsets " +
                             std::to_string(srcOffset) + "/" + std::to_string(dstOffset) +
                             " level " + std::to_string(level);
    EXPECT_EQ(0, memcmp(ref.data(), fast.data(), dstBytes + dstShift)) << what;
    VCImage_destroy(in);
    VCImage_destroy(outRef);
    VCImage_destroy(outFast);
}

const uint32_t kRgb32[] = {VC_FORMAT_RGBA, VC_FORMAT_BGRA, VC_FORMAT_ARGB, VC_FORMAT_ABGR};
const uint32_t kYuv420[] = {VC_FORMAT_NV12, VC_FORMAT_NV21, VC_FORMAT_YV12, VC_FORMAT_YUVP};
const Size kEven[] = {{2, 2},  {6, 4},  {14, 2}, {16, 2}, {30, 6},  {32, 4},   {34, 2},
                      {62, 4}, {64, 2}, {66, 6}, {96, 2}, {998, 4}, {1000, 6}, {1026, 2}};
const Size kOdd[] = {{1, 1}, {3, 5}, {9, 3}, {33, 7}, {1001, 3}};

}  // namespace

TEST(VCConvertFast, EveryVectorPairMatchesTheReference) {
    Quiet quiet;
    unsigned seed = 1;
    for (int level : vectorLevels()) {
        for (const Size& s : kEven) {
            const uint32_t displaced = static_cast<uint32_t>(s.w * s.h + 40);
            for (uint32_t sf : kYuv420)
                for (uint32_t df : kRgb32)
                    for (uint32_t off : {0u, displaced})
                        compareLevels(sf, df, s, off, 0, level, seed++);
            for (uint32_t sf : kRgb32)
                for (uint32_t df : kYuv420)
                    for (uint32_t off : {0u, displaced})
                        compareLevels(sf, df, s, 0, off, level, seed++);
        }
        for (const Size& s : kEven)
            for (uint32_t sf : kRgb32)
                for (uint32_t df : kRgb32)
                    if (sf != df) compareLevels(sf, df, s, 0, 0, level, seed++);
        for (const Size& s : kOdd)
            for (uint32_t sf : kRgb32)
                for (uint32_t df : kRgb32)
                    if (sf != df) compareLevels(sf, df, s, 0, 0, level, seed++);
    }
}

TEST(VCConvertFast, LargeOutputsMatchTheReference) {
    Quiet quiet;
    // Calls that move 12 MiB and more write whole 64-byte lines with
    // streaming stores, after a head that reaches the first line. Shifting
    // the destination by 4 bytes leaves 4:2:0 sources no even pixel count
    // to get there (plain stores then), by 8 bytes gives another head.
    // 2000 pixels leave a partial block at the end of every row.
    unsigned seed = 900;
    for (int level : vectorLevels()) {
        for (size_t shift : {0, 4, 8}) {
            compareLevels(VC_FORMAT_RGBA, VC_FORMAT_BGRA, {4096, 2050}, 0, 0, level, seed++, shift);
            compareLevels(VC_FORMAT_NV21, VC_FORMAT_ABGR, {4096, 2050}, 0, 0, level, seed++, shift);
            compareLevels(VC_FORMAT_NV12, VC_FORMAT_RGBA, {2000, 1200}, 0, 0, level, seed++, shift);
        }
        // Rows of 16008 bytes: two rows of a pair never align alike.
        compareLevels(VC_FORMAT_YV12, VC_FORMAT_RGBA, {4002, 2100}, 0, 0, level, seed++);
    }
}

TEST(VCConvertFast, LevelsAreCappedByTheCpu) {
    const int cpu = VCConvert_cpuLevel();
    EXPECT_EQ(kVCConvertScalar, VCConvert_setLevel(-5));
    EXPECT_EQ(kVCConvertScalar, VCConvert_level());
    EXPECT_EQ(cpu, VCConvert_setLevel(99));
    EXPECT_EQ(cpu, VCConvert_level());
#if defined(__x86_64__)
    EXPECT_GE(cpu, kVCConvertSse2);
    EXPECT_EQ(__builtin_cpu_supports("avx2") ? kVCConvertAvx2 : kVCConvertSse2, cpu);
#endif
}
