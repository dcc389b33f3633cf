// Colour conversion at the reference level: every (source, target) pair
// against an independent per-pixel model, fixed colours, refusals, odd and
// displaced layouts.
#include <gtest/gtest.h>
#include <string.h>

#include <tuple>
#include <vector>

#include "support/colour_model.h"
#include "support/image_ptr.h"
#include "vc_image_convert_fast.h"
#include "vccore/vc_convert.h"

namespace {

using Bytes = std::vector<uint8_t>;

// Reference level only: the vector paths have their own suite.
struct ScalarOnly {
    ScalarOnly() { VCConvert_setLevel(kVCConvertScalar); }
    ~ScalarOnly() { VCConvert_setLevel(VCConvert_cpuLevel()); }
};

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

const RgbPos* rgbPos(uint32_t format) {
    for (const RgbPos& p : kRgb)
        if (p.format == format) return &p;
    return nullptr;
}
bool is420(uint32_t f) {
    return VCImage_isYUV420(f) != 0;
}

// Pixel (x, y) read straight from the byte layout of each format: R, G, B, A
// (255 without alpha) or Y, U, V (128 for grey).
struct Sample {
    int c[3], a;
};
Sample sampleAt(const Bytes& buf, uint32_t format, int w, int h, int x, int y, size_t chromaAt) {
    const size_t i = static_cast<size_t>(y) * w + x;
    if (const RgbPos* p = rgbPos(format)) {
        const uint8_t* px = &buf[i * p->bpp];
        return {{px[p->r], px[p->g], px[p->b]}, p->a < 0 ? 255 : px[p->a]};
    }
    const size_t pair = (i / 2) * 4;
    if (format == VC_FORMAT_GREY) return {{buf[i], 128, 128}, 255};
    if (format == VC_FORMAT_YUYV) return {{buf[i * 2], buf[pair + 1], buf[pair + 3]}, 255};
    if (format == VC_FORMAT_YVYU) return {{buf[i * 2], buf[pair + 3], buf[pair + 1]}, 255};
    const size_t c = static_cast<size_t>(y / 2) * (w / 2) + x / 2,
                 q = static_cast<size_t>(w) * h / 4;
    if (format == VC_FORMAT_NV12)
        return {{buf[i], buf[chromaAt + 2 * c], buf[chromaAt + 2 * c + 1]}, 255};
    if (format == VC_FORMAT_NV21)
        return {{buf[i], buf[chromaAt + 2 * c + 1], buf[chromaAt + 2 * c]}, 255};
    if (format == VC_FORMAT_YV12) return {{buf[i], buf[chromaAt + q + c], buf[chromaAt + c]}, 255};
    return {{buf[i], buf[chromaAt + c], buf[chromaAt + q + c]}, 255};  // YUVP
}

// What the target holds at (x, y) for each pair: channels move between RGB
// orders, YUV becomes RGB by the equations, RGB becomes YUV in fixed point
// with the chroma of a block's first pixel (first row for 4:2:0), and YUV
// keeps its samples.
Sample expectedAt(const Bytes& src, uint32_t from, uint32_t to, int w, int h, int x, int y,
                  size_t chromaAt) {
    const Sample s = sampleAt(src, from, w, h, x, y, chromaAt);
    const bool rgbIn = rgbPos(from) != nullptr, rgbOut = rgbPos(to) != nullptr;
    if (rgbIn == rgbOut && rgbOut) return s;
    if (rgbOut) {
        Sample out{{}, 255};
        colour::yuvToRgb(s.c[0], s.c[1], s.c[2], out.c);
        return out;
    }
    const Sample c = sampleAt(src, from, w, h, x & ~1, is420(to) ? y & ~1 : y, chromaAt);
    if (!rgbIn) return {{s.c[0], c.c[1], c.c[2]}, 255};
    const int cy = colour::luma(c.c[0], c.c[1], c.c[2]);
    return {{colour::luma(s.c[0], s.c[1], s.c[2]), colour::chromaU(c.c[2], cy),
             colour::chromaV(c.c[0], cy)},
            255};
}

class ConvertPair : public ::testing::TestWithParam<std::tuple<uint32_t, uint32_t>> {};

TEST_P(ConvertPair, MatchesTheModelContiguousAndWithDisplacedChroma) {
    ScalarOnly scalar;
    const uint32_t from = std::get<0>(GetParam()), to = std::get<1>(GetParam());
    const int w = 10, h = 6;
    for (uint32_t gap : {0u, 8u}) {
        const uint32_t srcChroma = is420(from) && gap ? w * h + gap : 0;
        const uint32_t dstChroma = is420(to) && gap ? w * h + gap + 4 : 0;
        Bytes src = VCImageTest_randomBytes(4 * w * h, from ^ to ^ gap);
        Bytes dst(4 * w * h + 16, 0xAB);
        ImagePtr in =
            VCImageTest_wrap(src.data(), w, h, from, static_cast<int>(src.size()), srcChroma);
        ImagePtr out =
            VCImageTest_wrap(dst.data(), w, h, to, static_cast<int>(dst.size()), dstChroma);
        ASSERT_EQ(VC_OK, VCImage_convert(in.get(), out.get())) << gap;
        // Grey fills a quarter of the chroma only (its own test); grey keeps luma only.
        const bool chroma = from != VC_FORMAT_GREY && to != VC_FORMAT_GREY;
        const RgbPos* rgb = rgbPos(to);
        for (int y = 0; y < h; ++y)
            for (int x = 0; x < w; ++x) {
                const Sample want =
                    expectedAt(src, from, to, w, h, x, y, srcChroma ? srcChroma : w * h);
                const Sample got = sampleAt(dst, to, w, h, x, y, dstChroma ? dstChroma : w * h);
                ASSERT_EQ(want.c[0], got.c[0]) << x << "," << y << " gap " << gap;
                if (rgb != nullptr || chroma) {
                    ASSERT_EQ(want.c[1], got.c[1]) << x << "," << y << " gap " << gap;
                    ASSERT_EQ(want.c[2], got.c[2]) << x << "," << y << " gap " << gap;
                }
                if (rgb != nullptr && rgb->a >= 0) {
                    ASSERT_EQ(want.a, got.a) << x << "," << y;
                }
            }
    }
}

// Grey into 4:2:2 writes its neutral chroma over part of the luma: its own test.
std::vector<std::tuple<uint32_t, uint32_t>> allPairs() {
    std::vector<uint32_t> formats;
    for (const RgbPos& p : kRgb) formats.push_back(p.format);
    formats.insert(formats.end(), std::begin(kYuv), std::end(kYuv));
    std::vector<std::tuple<uint32_t, uint32_t>> out;
    for (uint32_t a : formats)
        for (uint32_t b : formats)
            if (a != VC_FORMAT_GREY || (b != VC_FORMAT_YUYV && b != VC_FORMAT_YVYU))
                out.emplace_back(a, b);
    return out;
}

INSTANTIATE_TEST_SUITE_P(AllPairs, ConvertPair, ::testing::ValuesIn(allPairs()),
                         VCImageTest_pairName);

// Fixed colours pin the coefficients themselves, independently of the model.
TEST(VCImageConvert, KnownColours) {
    ScalarOnly scalar;
    using namespace fourcc;
    const struct {
        int w, h;
        uint32_t from;
        Bytes in;
        uint32_t to;
        Bytes out;
    } rows[] = {
        // White supplies the chroma of the pair, red only luma; then red alone.
        {2, 1, RGBA, {255, 255, 255, 9, 255, 0, 0, 9}, YUYV, {255, 128, 76, 128}},
        {2, 1, RGBA, {255, 0, 0, 0, 0, 0, 0, 0}, YUYV, {76, 85, 0, 255}},
        // Black from (0, 128, 128), opaque in RGBA, three zeros in RGB8.
        {2, 2, NV21, {0, 0, 0, 0, 128, 128}, RGBA, {0, 0, 0, 255, 0, 0, 0, 255, 0, 0, 0, 255}},
        {2, 2, NV21, {0, 0, 0, 0, 128, 128}, RGB8, Bytes(12, 0)},
        // Alpha dropped into BGR8, made opaque out of RGB8, moved between orders.
        {2, 1, RGBA, {10, 20, 30, 40, 50, 60, 70, 80}, BGR8, {30, 20, 10, 70, 60, 50}},
        {2, 1, BGR8, {30, 20, 10, 70, 60, 50}, ARGB, {255, 10, 20, 30, 255, 50, 60, 70}},
        {2, 1, RGBA, {10, 20, 30, 40, 50, 60, 70, 80}, ABGR, {40, 30, 20, 10, 80, 70, 60, 50}},
    };
    for (auto r : rows) {
        ImagePtr in = VCImageTest_wrap(r.in.data(), r.w, r.h, r.from, r.in.size());
        ImagePtr out(VCImage_createNew(r.w, r.h, r.to));
        memset(out->data, 0x55, out->size);
        ASSERT_EQ(VC_OK, VCImage_convert(in.get(), out.get()));
        EXPECT_EQ(r.out, Bytes(out->data, out->data + r.out.size()))
            << VCImageTest_fourcc(r.from) << " -> " << VCImageTest_fourcc(r.to);
    }
}

// The order of the refusals: parity on each image's own geometry (odd width
// of a 4:2:x image, odd height only for 4:2:0), then the target's room; a
// refused target keeps its geometry.
TEST(VCImageConvert, Refusals) {
    ScalarOnly scalar;
    using namespace fourcc;
    Bytes pixels(64, 0);
    const struct {
        int sw, sh;
        uint32_t from;
        int ssize, dw, dh;
        uint32_t to;
        int dsize, status;
    } rows[] = {
        {2, 2, RGBA, 16, 2, 2, JPEG, 64, VC_ERROR_INVALID_PARAM},
        {2, 2, JPEG, 64, 2, 2, RGBA, 16, VC_ERROR_UNSUPPORTED},
        {3, 2, RGBA, 24, 3, 2, NV21, 9, VC_ERROR_INVALID_SIZE},
        {2, 3, RGBA, 24, 2, 3, NV21, 9, VC_ERROR_INVALID_SIZE},
        {2, 3, RGBA, 24, 2, 3, YUYV, 12, VC_OK},
        {3, 2, RGBA, 24, 3, 2, GREY, 6, VC_OK},
        {3, 2, YUYV, 24, 4, 4, RGBA, 64, VC_ERROR_INVALID_SIZE},
        {2, 2, RGBA, 16, 7, 1, RGBA, 10, VC_ERROR_INVALID_SIZE},  // a size field of 10 for 16
        // Without a size field the computed size of its own geometry counts.
        {2, 2, RGBA, 16, 1, 3, RGBA, 0, VC_ERROR_INVALID_SIZE},
        {2, 2, RGBA, 16, 2, 2, RGBA, 0, VC_OK},
    };
    Bytes out(64, 0);
    for (const auto& r : rows) {
        ImagePtr in = VCImageTest_wrap(pixels.data(), r.sw, r.sh, r.from, r.ssize);
        ImagePtr dst = VCImageTest_wrap(out.data(), r.dw, r.dh, r.to, r.dsize);
        EXPECT_EQ(r.status, VCImage_convert(in.get(), dst.get()))
            << VCImageTest_record(in.get()) << " -> " << VCImageTest_record(dst.get());
        if (r.status != VC_OK) {
            EXPECT_EQ(r.dw * 100 + r.dh, dst->width * 100 + dst->height);
        }
    }
    ImagePtr in = VCImageTest_wrap(pixels.data(), 2, 2, VC_FORMAT_RGBA, 16);
    ImagePtr header(VCImage_createEmpty(2, 2, VC_FORMAT_NV21));
    EXPECT_EQ(VC_ERROR_INVALID_PARAM, VCImage_convert(in.get(), header.get()));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_convert(nullptr, header.get()));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_convert(in.get(), nullptr));
}

// An existing even image takes an odd geometry: luma as usual, chroma for
// whole 2x2 (4:2:0) or 2x1 (4:2:2) blocks only, and nothing past the bytes the
// new geometry needs. At the machine's own level: no vector path may get it.
TEST(VCImageConvert, OddGeometryIntoAnEvenImageStaysInsideIt) {
    for (uint32_t to : {VC_FORMAT_NV12, VC_FORMAT_NV21, VC_FORMAT_YV12, VC_FORMAT_YUVP,
                        VC_FORMAT_YUYV, VC_FORMAT_YVYU}) {
        for (auto wh : {std::make_pair(3, 2), {3, 3}, {2, 3}, {5, 1}, {1, 1}}) {
            const int w = wh.first, h = wh.second;
            Bytes px = VCImageTest_randomBytes(static_cast<size_t>(w) * h * 4, w * 10 + h);
            ImagePtr src = VCImageTest_wrap(px.data(), w, h, VC_FORMAT_RGBA);
            const uint32_t need = VCImage_requiredSize(w, h, to);
            Bytes out(need + 16, 0xEE);
            ImagePtr dst = VCImageTest_wrap(out.data(), 4, 4, to, static_cast<int>(need));
            SCOPED_TRACE(VCImageTest_fourcc(to) + " " + std::to_string(w) + "x" +
                         std::to_string(h));
            ASSERT_EQ(VC_OK, VCImage_convert(src.get(), dst.get()));
            EXPECT_EQ(w * 100 + h, dst->width * 100 + dst->height);
            EXPECT_EQ(Bytes(16, 0xEE), Bytes(out.begin() + need, out.end()));
            for (int y = 0; y < h; ++y)
                for (int x = 0; x < w; ++x) {
                    const uint8_t* p = &px[(y * w + x) * 4];
                    const int yy = colour::luma(p[0], p[1], p[2]);
                    Sample got = sampleAt(out, to, w, h, x, y, static_cast<size_t>(w) * h);
                    ASSERT_EQ(yy, got.c[0]) << x << "," << y;
                    if (!is420(to) || x % 2 || y % 2 || x + 1 >= w || y + 1 >= h) continue;
                    EXPECT_EQ(colour::chromaU(p[2], yy), got.c[1]);
                    EXPECT_EQ(colour::chromaV(p[0], yy), got.c[2]);
                }
        }
    }
}

TEST(VCImageConvert, GreyFillsChromaWith127OverAQuarter) {
    ScalarOnly scalar;
    Bytes grey = VCImageTest_randomBytes(8 * 4, 3);
    ImagePtr src = VCImageTest_wrap(grey.data(), 8, 4, VC_FORMAT_GREY, 32);
    // Semi-planar and planar: 8 bytes (the lower plane) after the luma; 4:2:2
    // half the pixel count from byte 1, over the interleaved luma.
    const struct {
        uint32_t format;
        int first, last, untouched;
    } rows[] = {
        {VC_FORMAT_NV12, 32, 39, 40}, {VC_FORMAT_YV12, 32, 39, 40}, {VC_FORMAT_YUYV, 1, 16, 19}};
    for (const auto& r : rows) {
        ImagePtr out(VCImage_createNew(8, 4, r.format));
        memset(out->data, 0x11, out->size);
        ASSERT_EQ(VC_OK, VCImage_convert(src.get(), out.get()));
        for (int i = r.first; i <= r.last; ++i)
            EXPECT_EQ(127, out->data[i]) << VCImageTest_fourcc(r.format) << " byte " << i;
        EXPECT_EQ(0x11, out->data[r.untouched]) << VCImageTest_fourcc(r.format);
        if (r.format == VC_FORMAT_YUYV) {
            EXPECT_EQ(grey[9], out->data[18]);
        }
    }
}

TEST(VCImageConvert, SameFormatCopiesHonourChromaOffsets) {
    ScalarOnly scalar;
    const int w = 6, h = 4;
    Bytes srcBuf = VCImageTest_randomBytes(64, 5), dstBuf(36, 0xEE), same(64, 0), cramped(40, 0);
    ImagePtr src = VCImageTest_wrap(srcBuf.data(), w, h, VC_FORMAT_NV21, 64, 40);
    ImagePtr dst = VCImageTest_wrap(dstBuf.data(), 2, 2, VC_FORMAT_NV21, 36);
    ASSERT_EQ(VC_OK, VCImage_convert(src.get(), dst.get()));
    EXPECT_EQ(w, dst->width);
    EXPECT_EQ(0, memcmp(srcBuf.data(), dstBuf.data(), 24));
    EXPECT_EQ(0, memcmp(srcBuf.data() + 40, dstBuf.data() + 24, 12));
    // Equal offsets and size fields: one block of the size field.
    ImagePtr copy = VCImageTest_wrap(same.data(), w, h, VC_FORMAT_NV21, 64, 40);
    ASSERT_EQ(VC_OK, VCImage_convert(src.get(), copy.get()));
    EXPECT_EQ(srcBuf, same);
    // A displaced chroma plane that would run past the size field is refused.
    ImagePtr tight = VCImageTest_wrap(cramped.data(), w, h, VC_FORMAT_NV21, 40, 30);
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_convert(src.get(), tight.get()));
}

// Without a size field a chroma offset beyond w·h + w·h/2 is trusted: the
// bands of a larger frame and padded camera buffers are wrapped so.
TEST(VCImageConvert, DisplacedChromaWithoutSizeField) {
    const int w = 8, h = 4;
    const size_t luma = w * h, gap = 24;
    for (int level : {static_cast<int>(kVCConvertScalar), VCConvert_cpuLevel()}) {
        VCConvert_setLevel(level);
        Bytes frame = VCImageTest_randomBytes(luma + gap + luma / 2, 11), packed(luma * 3 / 2);
        memcpy(packed.data(), frame.data(), luma);
        memcpy(packed.data() + luma, frame.data() + luma + gap, luma / 2);
        ImagePtr band = VCImageTest_wrap(frame.data(), w, h, VC_FORMAT_NV21, 0, luma + gap);
        ImagePtr plain = VCImageTest_wrap(packed.data(), w, h, VC_FORMAT_NV21);
        ImagePtr fromBand(VCImage_copyAndConvert(band.get(), VC_FORMAT_RGBA));
        ImagePtr fromPlain(VCImage_copyAndConvert(plain.get(), VC_FORMAT_RGBA));
        ASSERT_TRUE(fromBand && fromPlain);
        EXPECT_EQ(VCImageTest_bytes(*fromPlain), VCImageTest_bytes(*fromBand)) << level;
        // Written: the chroma lands behind the gap, which stays untouched.
        Bytes out(frame.size(), 0xEE);
        ImagePtr outBand = VCImageTest_wrap(out.data(), w, h, VC_FORMAT_NV21, 0, luma + gap);
        ASSERT_EQ(VC_OK, VCImage_convert(fromPlain.get(), outBand.get()));
        ImagePtr expected(VCImage_copyAndConvert(fromPlain.get(), VC_FORMAT_NV21));
        Bytes want(expected->data, expected->data + luma);
        want.insert(want.end(), gap, 0xEE);
        want.insert(want.end(), expected->data + luma, expected->data + luma * 3 / 2);
        EXPECT_EQ(want, out) << level;
    }
    VCConvert_setLevel(VCConvert_cpuLevel());
}

TEST(VCImageConvert, CopyAndConvert) {
    ScalarOnly scalar;
    uint8_t px[16] = {1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15, 16};
    ImagePtr src = VCImageTest_wrap(px, 2, 2, VC_FORMAT_RGBA, sizeof(px));
    ImagePtr bgra(VCImage_copyAndConvert(src.get(), VC_FORMAT_BGRA));
    ASSERT_NE(nullptr, bgra);
    EXPECT_EQ("2x2 BGRA wrapped 0 size 16 uv 0", VCImageTest_record(bgra.get()));
    EXPECT_EQ(Bytes({3, 2, 1, 4}), Bytes(bgra->data, bgra->data + 4));
    EXPECT_EQ(nullptr, VCImage_copyAndConvert(nullptr, VC_FORMAT_BGRA));
    EXPECT_EQ(nullptr, VCImage_copyAndConvert(src.get(), VC_FORMAT_JPEG));
    src->width = 1;
    EXPECT_EQ(nullptr, VCImage_copyAndConvert(src.get(), VC_FORMAT_NV12));
}

}  // namespace
