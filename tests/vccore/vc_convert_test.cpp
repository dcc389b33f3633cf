// Colour conversion: the order of the checks, their log lines, and the pixel
// arithmetic of every family pair against an independent per-pixel model.
#include <gtest/gtest.h>
#include <stdlib.h>
#include <string.h>

#include <random>
#include <string>
#include <vector>

#include "support/log_capture.h"
#include "vc_error_lines.h"
#include "vc_image_convert_fast.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_log.h"

namespace {

using Bytes = std::vector<uint8_t>;

// Reference level only: the vector paths have their own suite.
struct ScalarOnly {
    ScalarOnly() { VCConvert_setLevel(kVCConvertScalar); }
    ~ScalarOnly() { VCConvert_setLevel(VCConvert_cpuLevel()); }
};

int clampTo8(int v) {
    return v < 0 ? 0 : (v > 255 ? 255 : v);
}

// Written from the equations, with its own plane arithmetic.
void expectRgb(int y, int u, int v, int* r, int* g, int* b) {
    *r = clampTo8(static_cast<int>(y + 1.402 * (v - 128)));
    *g = clampTo8(static_cast<int>(y - 0.34414 * (u - 128) - 0.71414 * (v - 128)));
    *b = clampTo8(static_cast<int>(y + 1.772 * (u - 128)));
}

struct Yuv {
    int y, u, v;
};

// Sample of pixel (x, y) read straight from the byte layout of each format.
Yuv sampleAt(const std::vector<uint8_t>& buf, uint32_t format, int w, int h, int x, int y,
             size_t chromaAt) {
    const size_t luma = static_cast<size_t>(w) * h;
    const size_t i = static_cast<size_t>(y) * w + x;
    switch (format) {
        case VC_FORMAT_GREY:
            return {buf[i], 128, 128};
        case VC_FORMAT_YUYV: {
            const size_t p = (i / 2) * 4;
            return {buf[i * 2], buf[p + 1], buf[p + 3]};
        }
        case VC_FORMAT_YVYU: {
            const size_t p = (i / 2) * 4;
            return {buf[i * 2], buf[p + 3], buf[p + 1]};
        }
        default:
            break;
    }
    const size_t c = static_cast<size_t>(y / 2) * (w / 2) + x / 2;
    const size_t q = luma / 4;
    switch (format) {
        case VC_FORMAT_NV12:
            return {buf[i], buf[chromaAt + 2 * c], buf[chromaAt + 2 * c + 1]};
        case VC_FORMAT_NV21:
            return {buf[i], buf[chromaAt + 2 * c + 1], buf[chromaAt + 2 * c]};
        case VC_FORMAT_YV12:
            return {buf[i], buf[chromaAt + q + c], buf[chromaAt + c]};
        default:
            return {buf[i], buf[chromaAt + c], buf[chromaAt + q + c]};  // YUVP
    }
}

std::vector<uint8_t> randomBytes(size_t n, unsigned seed) {
    std::mt19937 rng(seed);
    std::vector<uint8_t> out(n);
    for (uint8_t& b : out) b = static_cast<uint8_t>(rng());
    return out;
}

struct RgbPos {
    uint32_t format;
    int bpp, r, g, b, a;
};
const RgbPos kRgb[] = {
    {VC_FORMAT_RGBA, 4, 0, 1, 2, 3},  {VC_FORMAT_BGRA, 4, 2, 1, 0, 3},
    {VC_FORMAT_ARGB, 4, 1, 2, 3, 0},  {VC_FORMAT_ABGR, 4, 3, 2, 1, 0},
    {VC_FORMAT_RGB8, 3, 0, 1, 2, -1}, {VC_FORMAT_BGR8, 3, 2, 1, 0, -1},
};
const uint32_t kYuv[] = {VC_FORMAT_GREY, VC_FORMAT_YUYV, VC_FORMAT_YVYU, VC_FORMAT_NV12,
                         VC_FORMAT_NV21, VC_FORMAT_YV12, VC_FORMAT_YUVP};

}  // namespace

TEST(VCImageConvert, ChecksRunInOrderWithTheirLogLines) {
    ScalarOnly scalar;
    LogCapture log;
    uint8_t pixels[64] = {};
    VCImage* rgba = VCImage_createWrap(pixels, 2, 2, VC_FORMAT_RGBA, 16, 0);
    VCImage* nv21 = VCImage_createNew(2, 2, VC_FORMAT_NV21);

    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_convert(nullptr, nv21));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_convert(rgba, nullptr));
    EXPECT_TRUE(countErrors(log, "VC_ERROR_NULL_PARAM", -2, "vccore/src/vc_image"));
    EXPECT_FALSE(log.contains("[VCImage] Converting from 2x2 RGBA to 2x2 NV21"));

    // The debug line comes before the data check.
    VCImage* header = VCImage_createEmpty(2, 2, VC_FORMAT_NV21);
    log.clear();
    EXPECT_EQ(VC_ERROR_INVALID_PARAM, VCImage_convert(rgba, header));
    EXPECT_TRUE(log.contains(VF_LOG_DEBUG, "[VCImage] Converting from 2x2 RGBA to 2x2 NV21"));
    EXPECT_TRUE(countErrors(log, "VC_ERROR_INVALID_PARAM", -3, "vccore/src/vc_image"));
    VCImage_destroy(header);

    // A target without a required size.
    VCImage* jpeg = VCImage_createWrap(pixels, 2, 2, VC_FORMAT_JPEG, 64, 0);
    EXPECT_EQ(VC_ERROR_INVALID_PARAM, VCImage_convert(rgba, jpeg));
    // A source outside every family.
    log.clear();
    EXPECT_EQ(VC_ERROR_UNSUPPORTED, VCImage_convert(jpeg, rgba));
    EXPECT_TRUE(log.contains(VF_LOG_ERROR, "[VCImage] Can not convert JPEG into RGBA"));
    EXPECT_TRUE(countErrors(log, "VC_ERROR_UNSUPPORTED", -6, "vccore/src/vc_image"));
    VCImage_destroy(jpeg);

    // Parity is tested on each image's own geometry: odd width of a YUV
    // target, odd height only for 4:2:0. An even target that then takes an
    // odd geometry is the next test's matter.
    uint8_t wide[3 * 2 * 4] = {};
    VCImage* odd = VCImage_createWrap(wide, 3, 2, VC_FORMAT_RGBA, sizeof(wide), 0);
    VCImage* target = VCImage_createNew(3, 2, VC_FORMAT_NV21);
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_convert(odd, target));
    EXPECT_EQ(nullptr, VCImage_copyAndConvert(odd, VC_FORMAT_YUYV));
    target->width = 2;
    target->height = 3;
    VCImage* tall = VCImage_createWrap(wide, 2, 3, VC_FORMAT_RGBA, sizeof(wide), 0);
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_convert(tall, target));
    EXPECT_EQ(2, target->width);
    VCImage* yuyv = VCImage_createNew(2, 3, VC_FORMAT_YUYV);
    EXPECT_EQ(VC_OK, VCImage_convert(tall, yuyv));
    VCImage* grey = VCImage_createNew(3, 2, VC_FORMAT_GREY);
    EXPECT_EQ(VC_OK, VCImage_convert(odd, grey));
    // An odd source of a YUV family other than grey.
    VCImage* oddYuyv = VCImage_createWrap(wide, 3, 2, VC_FORMAT_YUYV, sizeof(wide), 0);
    VCImage* out = VCImage_createNew(4, 4, VC_FORMAT_RGBA);
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_convert(oddYuyv, out));

    // A size field of 10 for a required 16 keeps the old geometry.
    uint8_t small[16];
    VCImage* tight = VCImage_createWrap(small, 7, 1, VC_FORMAT_RGBA, 10, 0);
    uint8_t src4[4 * 4 * 4] = {};
    VCImage* square = VCImage_createWrap(src4, 2, 2, VC_FORMAT_RGBA, 16, 0);
    log.clear();
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_convert(square, tight));
    EXPECT_EQ(7, tight->width);
    EXPECT_EQ(1, tight->height);
    EXPECT_TRUE(countErrors(log, "VC_ERROR_INVALID_SIZE", -4, "vccore/src/vc_image"));
    // With no size field the computed size of its own geometry counts.
    VCImage* smallHeader = VCImage_createWrap(small, 1, 3, VC_FORMAT_RGBA, 0, 0);
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_convert(square, smallHeader));
    smallHeader->width = 2;
    smallHeader->height = 2;
    EXPECT_EQ(VC_OK, VCImage_convert(square, smallHeader));

    for (VCImage* i :
         {rgba, nv21, odd, target, tall, yuyv, grey, oddYuyv, out, tight, square, smallHeader})
        VCImage_destroy(i);
}

// An existing even image takes an odd geometry (3x2 "RGBA" into a 4x4 "NV21"
// is no error): luma as usual, chroma for whole 2x2 (4:2:0) or 2x1 (4:2:2)
// blocks only, and nothing past the bytes the new geometry needs. Run at the
// machine's own level: no vector path may get such a target.
TEST(VCImageConvert, OddGeometryIntoAnEvenImageStaysInsideIt) {
    const int sizes[][2] = {{3, 2}, {3, 3}, {2, 3}, {5, 1}, {1, 1}};
    for (uint32_t tf : {VC_FORMAT_NV12, VC_FORMAT_NV21, VC_FORMAT_YV12, VC_FORMAT_YUVP,
                        VC_FORMAT_YUYV, VC_FORMAT_YVYU}) {
        const bool is420 = VCImage_isYUV420(tf) != 0;
        for (const auto& wh : sizes) {
            const int w = wh[0], h = wh[1];
            std::vector<uint8_t> px = randomBytes(static_cast<size_t>(w) * h * 4, w * 10 + h);
            VCImage* src = VCImage_createWrap(px.data(), w, h, VC_FORMAT_RGBA, 0, 0);
            const uint32_t need = VCImage_requiredSize(w, h, tf);
            std::vector<uint8_t> out(need + 16, 0xEE);
            VCImage* dst = VCImage_createWrap(out.data(), 4, 4, tf, static_cast<int>(need), 0);
            const std::string what = std::string(reinterpret_cast<const char*>(&tf), 4) + " " +
                                     std::to_string(w) + "x" + std::to_string(h);
            ASSERT_EQ(VC_OK, VCImage_convert(src, dst)) << what;
            EXPECT_EQ(w, dst->width);
            EXPECT_EQ(h, dst->height);
            EXPECT_EQ(Bytes(16, 0xEE), Bytes(out.begin() + need, out.end())) << what;
            for (int y = 0; y < h; ++y) {
                for (int x = 0; x < w; ++x) {
                    const uint8_t* p = px.data() + (y * w + x) * 4;
                    const int yy = (19595 * p[0] + 38470 * p[1] + 7471 * p[2]) >> 16;
                    Yuv got = sampleAt(out, tf, w, h, x, y, static_cast<size_t>(w) * h);
                    ASSERT_EQ(yy, got.y) << what << " at " << x << "," << y;
                    // Whole 4:2:0 blocks, read at their top-left pixel.
                    if (!is420 || x % 2 != 0 || y % 2 != 0 || x + 1 >= w || y + 1 >= h) continue;
                    EXPECT_EQ(clampTo8(((36962 * (p[2] - yy)) >> 16) + 128), got.u) << what;
                    EXPECT_EQ(clampTo8(((46727 * (p[0] - yy)) >> 16) + 128), got.v) << what;
                }
            }
            VCImage_destroy(src);
            VCImage_destroy(dst);
        }
    }
}

// Fixed colours pin the coefficients themselves, independently of the model below.
TEST(VCImageConvert, KnownColours) {
    ScalarOnly scalar;
    // Row 0: white supplies the chroma of the pair, red only luma; then red alone.
    uint8_t rgb[16] = {255, 255, 255, 9, 255, 0, 0, 9, 255, 255, 255, 9, 255, 0, 0, 9};
    uint8_t red[8] = {255, 0, 0, 0, 0, 0, 0, 0};
    VCImage* src = VCImage_createWrap(rgb, 2, 2, VC_FORMAT_RGBA, sizeof(rgb), 0);
    VCImage* redImg = VCImage_createWrap(red, 2, 1, VC_FORMAT_RGBA, sizeof(red), 0);
    VCImage* yuyv = VCImage_createNew(2, 2, VC_FORMAT_YUYV);
    ASSERT_EQ(VC_OK, VCImage_convert(src, yuyv));
    EXPECT_EQ(Bytes({255, 128, 76, 128}), Bytes(yuyv->data, yuyv->data + 4));
    ASSERT_EQ(VC_OK, VCImage_convert(redImg, yuyv));
    EXPECT_EQ(Bytes({76, 85, 0, 255}), Bytes(yuyv->data, yuyv->data + 4));

    // Black from (0, 128, 128), with alpha 255 in RGBA and three zeros in RGB8.
    uint8_t nv[6] = {0, 0, 0, 0, 128, 128};
    VCImage* black = VCImage_createWrap(nv, 2, 2, VC_FORMAT_NV21, sizeof(nv), 0);
    VCImage* rgba = VCImage_createNew(2, 2, VC_FORMAT_RGBA);
    VCImage* rgb8 = VCImage_createNew(2, 2, VC_FORMAT_RGB8);
    memset(rgba->data, 0x55, 16);
    memset(rgb8->data, 0x55, 12);
    ASSERT_EQ(VC_OK, VCImage_convert(black, rgba));
    ASSERT_EQ(VC_OK, VCImage_convert(black, rgb8));
    for (int i = 0; i < 16; ++i) EXPECT_EQ(i % 4 == 3 ? 255 : 0, rgba->data[i]) << i;
    EXPECT_EQ(Bytes(12, 0), Bytes(rgb8->data, rgb8->data + 12));

    // Alpha is dropped into BGR8, made opaque out of RGB8 and moved between 32-bit orders.
    uint8_t px[8] = {10, 20, 30, 40, 50, 60, 70, 80};
    VCImage* two = VCImage_createWrap(px, 2, 1, VC_FORMAT_RGBA, sizeof(px), 0);
    VCImage* bgr = VCImage_createNew(2, 1, VC_FORMAT_BGR8);
    VCImage* argb = VCImage_createNew(2, 1, VC_FORMAT_ARGB);
    VCImage* abgr = VCImage_createNew(2, 1, VC_FORMAT_ABGR);
    ASSERT_EQ(VC_OK, VCImage_convert(two, bgr));
    ASSERT_EQ(VC_OK, VCImage_convert(bgr, argb));
    ASSERT_EQ(VC_OK, VCImage_convert(two, abgr));
    EXPECT_EQ(Bytes({30, 20, 10, 70, 60, 50}), Bytes(bgr->data, bgr->data + 6));
    EXPECT_EQ(Bytes({255, 10, 20, 30, 255, 50, 60, 70}), Bytes(argb->data, argb->data + 8));
    EXPECT_EQ(Bytes({40, 30, 20, 10, 80, 70, 60, 50}), Bytes(abgr->data, abgr->data + 8));
    for (VCImage* i : {src, yuyv, redImg, black, rgba, rgb8, two, bgr, argb, abgr})
        VCImage_destroy(i);
}

TEST(VCImageConvert, GreyFillsChromaWith127OverAQuarter) {
    ScalarOnly scalar;
    std::vector<uint8_t> grey = randomBytes(8 * 4, 3);
    VCImage* src = VCImage_createWrap(grey.data(), 8, 4, VC_FORMAT_GREY, 32, 0);
    VCImage* nv12 = VCImage_createNew(8, 4, VC_FORMAT_NV12);
    memset(nv12->data, 0x11, nv12->size);
    ASSERT_EQ(VC_OK, VCImage_convert(src, nv12));
    EXPECT_EQ(0, memcmp(grey.data(), nv12->data, 32));
    for (int i = 0; i < 8; ++i) EXPECT_EQ(127, nv12->data[32 + i]) << i;
    for (int i = 8; i < 16; ++i) EXPECT_EQ(0x11, nv12->data[32 + i]) << i;

    // Planar: the lower plane (V for YV12) only.
    VCImage* yv12 = VCImage_createNew(8, 4, VC_FORMAT_YV12);
    memset(yv12->data, 0x11, yv12->size);
    ASSERT_EQ(VC_OK, VCImage_convert(src, yv12));
    for (int i = 0; i < 8; ++i) EXPECT_EQ(127, yv12->data[32 + i]);
    for (int i = 8; i < 16; ++i) EXPECT_EQ(0x11, yv12->data[32 + i]);

    // 4:2:2: half the pixel count from byte 1, over the interleaved luma.
    VCImage* yuyv = VCImage_createNew(8, 4, VC_FORMAT_YUYV);
    memset(yuyv->data, 0x11, yuyv->size);
    ASSERT_EQ(VC_OK, VCImage_convert(src, yuyv));
    EXPECT_EQ(grey[0], yuyv->data[0]);
    for (int i = 1; i <= 16; ++i) EXPECT_EQ(127, yuyv->data[i]) << i;
    EXPECT_EQ(grey[9], yuyv->data[18]);
    EXPECT_EQ(0x11, yuyv->data[19]);

    // Grey out of a YUV source takes the luma only.
    VCImage* back = VCImage_createNew(8, 4, VC_FORMAT_GREY);
    ASSERT_EQ(VC_OK, VCImage_convert(yv12, back));
    EXPECT_EQ(0, memcmp(grey.data(), back->data, 32));
    for (VCImage* i : {src, nv12, yv12, yuyv, back}) VCImage_destroy(i);
}

TEST(VCImageConvert, SameFormatCopiesHonourChromaOffsets) {
    ScalarOnly scalar;
    const int w = 6, h = 4;
    std::vector<uint8_t> srcBuf = randomBytes(64, 5);
    VCImage* src = VCImage_createWrap(srcBuf.data(), w, h, VC_FORMAT_NV21, 64, 40);
    std::vector<uint8_t> dstBuf(36, 0xEE);
    VCImage* dst = VCImage_createWrap(dstBuf.data(), 2, 2, VC_FORMAT_NV21, 36, 0);
    ASSERT_EQ(VC_OK, VCImage_convert(src, dst));
    EXPECT_EQ(w, dst->width);
    EXPECT_EQ(0, memcmp(srcBuf.data(), dstBuf.data(), 24));
    EXPECT_EQ(0, memcmp(srcBuf.data() + 40, dstBuf.data() + 24, 12));

    // Equal offsets and equal size fields: one block of the size field.
    std::vector<uint8_t> same(64, 0);
    VCImage* copy = VCImage_createWrap(same.data(), w, h, VC_FORMAT_NV21, 64, 40);
    ASSERT_EQ(VC_OK, VCImage_convert(src, copy));
    EXPECT_EQ(srcBuf, same);

    // A displaced chroma plane that would run past the size field is refused.
    std::vector<uint8_t> shortBuf(40, 0);
    VCImage* cramped = VCImage_createWrap(shortBuf.data(), w, h, VC_FORMAT_NV21, 40, 30);
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_convert(src, cramped));
    for (VCImage* i : {src, dst, copy, cramped}) VCImage_destroy(i);
}

// Without a size field a chroma offset beyond w·h + w·h/2 is trusted: the
// bands of a larger frame and padded camera buffers are wrapped so.
TEST(VCImageConvert, DisplacedChromaWithoutSizeField) {
    const int w = 8, h = 4;
    const size_t luma = w * h, gap = 24;
    for (int level : {static_cast<int>(kVCConvertScalar), VCConvert_cpuLevel()}) {
        VCConvert_setLevel(level);
        Bytes frame = randomBytes(luma + gap + luma / 2, 11);
        Bytes packed(luma + luma / 2);
        memcpy(packed.data(), frame.data(), luma);
        memcpy(packed.data() + luma, frame.data() + luma + gap, luma / 2);
        VCImage* band = VCImage_createWrap(frame.data(), w, h, VC_FORMAT_NV21, 0, luma + gap);
        VCImage* plain = VCImage_createWrap(packed.data(), w, h, VC_FORMAT_NV21, 0, 0);
        // Read: the same pixels as the contiguous picture.
        VCImage* fromBand = VCImage_createNew(w, h, VC_FORMAT_RGBA);
        VCImage* fromPlain = VCImage_createNew(w, h, VC_FORMAT_RGBA);
        ASSERT_EQ(VC_OK, VCImage_convert(band, fromBand));
        ASSERT_EQ(VC_OK, VCImage_convert(plain, fromPlain));
        EXPECT_EQ(0, memcmp(fromBand->data, fromPlain->data, luma * 4));
        // Write: the chroma lands behind the gap, which stays untouched.
        Bytes out(frame.size(), 0xEE);
        VCImage* outBand = VCImage_createWrap(out.data(), w, h, VC_FORMAT_NV21, 0, luma + gap);
        ASSERT_EQ(VC_OK, VCImage_convert(fromPlain, outBand));
        VCImage* expected = VCImage_copyAndConvert(fromPlain, VC_FORMAT_NV21);
        ASSERT_NE(nullptr, expected);
        EXPECT_EQ(0, memcmp(out.data(), expected->data, luma));
        EXPECT_EQ(Bytes(gap, 0xEE), Bytes(out.begin() + luma, out.begin() + luma + gap));
        EXPECT_EQ(0, memcmp(out.data() + luma + gap, expected->data + luma, luma / 2));
        // Same format, other offset: the planes move.
        Bytes moved(luma + 8 + luma / 2, 0xEE);
        VCImage* movedImg = VCImage_createWrap(moved.data(), w, h, VC_FORMAT_NV21, 0, luma + 8);
        ASSERT_EQ(VC_OK, VCImage_convert(band, movedImg));
        EXPECT_EQ(Bytes(frame.begin(), frame.begin() + luma),
                  Bytes(moved.begin(), moved.begin() + luma));
        EXPECT_EQ(Bytes(frame.begin() + luma + gap, frame.end()),
                  Bytes(moved.begin() + luma + 8, moved.end()));
        for (VCImage* i : {band, plain, fromBand, fromPlain, outBand, expected, movedImg})
            VCImage_destroy(i);
    }
    VCConvert_setLevel(VCConvert_cpuLevel());
}

TEST(VCImageConvert, YuvToRgbMatchesTheEquationsForEverySourceAndTarget) {
    ScalarOnly scalar;
    const int w = 10, h = 6;
    for (uint32_t sf : kYuv) {
        for (size_t displaced : {static_cast<size_t>(0), static_cast<size_t>(w * h + 8)}) {
            if (displaced != 0 && !VCImage_isYUV420(sf)) continue;
            std::vector<uint8_t> buf = randomBytes(3 * w * h, sf + displaced);
            VCImage* src = VCImage_createWrap(buf.data(), w, h, sf, static_cast<int>(buf.size()),
                                              static_cast<uint32_t>(displaced));
            const size_t chromaAt = displaced != 0 ? displaced : static_cast<size_t>(w * h);
            for (const RgbPos& t : kRgb) {
                VCImage* dst = VCImage_createNew(w, h, t.format);
                ASSERT_EQ(VC_OK, VCImage_convert(src, dst));
                for (int y = 0; y < h; ++y) {
                    for (int x = 0; x < w; ++x) {
                        Yuv s = sampleAt(buf, sf, w, h, x, y, chromaAt);
                        int r, g, b;
                        expectRgb(s.y, s.u, s.v, &r, &g, &b);
                        const uint8_t* px = dst->data + (y * w + x) * t.bpp;
                        ASSERT_EQ(r, px[t.r]) << x << "," << y;
                        ASSERT_EQ(g, px[t.g]);
                        ASSERT_EQ(b, px[t.b]);
                        if (t.a >= 0) {
                            ASSERT_EQ(255, px[t.a]);
                        }
                    }
                }
                VCImage_destroy(dst);
            }
            VCImage_destroy(src);
        }
    }
}

TEST(VCImageConvert, RgbToYuvPointSamplesTheChroma) {
    ScalarOnly scalar;
    const int w = 8, h = 6;
    for (const RgbPos& s : kRgb) {
        std::vector<uint8_t> px = randomBytes(static_cast<size_t>(w) * h * s.bpp, s.format);
        VCImage* src =
            VCImage_createWrap(px.data(), w, h, s.format, static_cast<int>(px.size()), 0);
        for (uint32_t tf : kYuv) {
            std::vector<uint8_t> out(2 * w * h + 16, 0xAB);
            const uint32_t displaced = VCImage_isYUV420(tf) ? w * h + 16 : 0;
            VCImage* dst =
                VCImage_createWrap(out.data(), w, h, tf, static_cast<int>(out.size()), displaced);
            ASSERT_EQ(VC_OK, VCImage_convert(src, dst));
            const size_t chromaAt = displaced != 0 ? displaced : static_cast<size_t>(w * h);
            for (int y = 0; y < h; ++y) {
                for (int x = 0; x < w; ++x) {
                    const uint8_t* p = px.data() + (y * w + x) * s.bpp;
                    const int yy = (19595 * p[s.r] + 38470 * p[s.g] + 7471 * p[s.b]) >> 16;
                    Yuv got = sampleAt(out, tf, w, h, x, y, chromaAt);
                    ASSERT_EQ(yy, got.y);
                    if (tf == VC_FORMAT_GREY) continue;
                    // The chroma comes from the top-left pixel of its block.
                    const int cy = VCImage_isYUV420(tf) ? y & ~1 : y;
                    const uint8_t* c = px.data() + (cy * w + (x & ~1)) * s.bpp;
                    const int cl = (19595 * c[s.r] + 38470 * c[s.g] + 7471 * c[s.b]) >> 16;
                    ASSERT_EQ(clampTo8(((36962 * (c[s.b] - cl)) >> 16) + 128), got.u);
                    ASSERT_EQ(clampTo8(((46727 * (c[s.r] - cl)) >> 16) + 128), got.v);
                }
            }
            VCImage_destroy(dst);
        }
        VCImage_destroy(src);
    }
}

TEST(VCImageConvert, YuvToYuvMovesChromaBetweenSubsamplings) {
    ScalarOnly scalar;
    const int w = 8, h = 4;
    for (uint32_t sf : kYuv) {
        if (sf == VC_FORMAT_GREY) continue;
        std::vector<uint8_t> buf = randomBytes(2 * w * h, sf);
        VCImage* src = VCImage_createWrap(buf.data(), w, h, sf, static_cast<int>(buf.size()), 0);
        for (uint32_t tf : kYuv) {
            if (tf == sf) continue;
            std::vector<uint8_t> out(2 * w * h, 0);
            VCImage* dst =
                VCImage_createWrap(out.data(), w, h, tf, static_cast<int>(out.size()), 0);
            ASSERT_EQ(VC_OK, VCImage_convert(src, dst));
            for (int y = 0; y < h; ++y) {
                for (int x = 0; x < w; ++x) {
                    Yuv a = sampleAt(buf, sf, w, h, x, y, w * h);
                    Yuv b = sampleAt(out, tf, w, h, x, y, w * h);
                    ASSERT_EQ(a.y, b.y);
                    if (tf == VC_FORMAT_GREY) continue;
                    // 4:2:2 into 4:2:0 keeps the chroma of the even row.
                    Yuv c = (VCImage_isYUV420(tf) && !VCImage_isYUV420(sf))
                                ? sampleAt(buf, sf, w, h, x, y & ~1, w * h)
                                : a;
                    ASSERT_EQ(c.u, b.u) << x << "," << y;
                    ASSERT_EQ(c.v, b.v);
                }
            }
            VCImage_destroy(dst);
        }
        VCImage_destroy(src);
    }
}

TEST(VCImageConvert, CopyAndConvert) {
    ScalarOnly scalar;
    uint8_t px[16] = {1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15, 16};
    VCImage* src = VCImage_createWrap(px, 2, 2, VC_FORMAT_RGBA, sizeof(px), 0);
    VCImage* bgra = VCImage_copyAndConvert(src, VC_FORMAT_BGRA);
    ASSERT_NE(nullptr, bgra);
    EXPECT_EQ(0, bgra->wrapped);
    EXPECT_EQ(2, bgra->width);
    EXPECT_EQ(3, bgra->data[0]);
    EXPECT_EQ(1, bgra->data[2]);
    EXPECT_EQ(4, bgra->data[3]);
    EXPECT_EQ(nullptr, VCImage_copyAndConvert(nullptr, VC_FORMAT_BGRA));
    EXPECT_EQ(nullptr, VCImage_copyAndConvert(src, VC_FORMAT_JPEG));
    src->width = 1;
    EXPECT_EQ(nullptr, VCImage_copyAndConvert(src, VC_FORMAT_NV12));
    VCImage_destroy(bgra);
    VCImage_destroy(src);
}
