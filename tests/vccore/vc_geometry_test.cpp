// Scaling, cropping, rotation and pasting: error ladders, log lines and the
// exact pixels moved.
#include <gtest/gtest.h>
#include <string.h>

#include <string>
#include <vector>

#include "support/log_capture.h"
#include "vc_error_lines.h"
#include "vccore/vc_geometry.h"
#include "vccore/vc_log.h"

namespace {

// An owning RGBA image whose pixel (x, y) reads (x, y, 7, 200 + tag).
VCImage* labelled(int w, int h, int tag = 0) {
    VCImage* img = VCImage_createNew(w, h, VC_FORMAT_RGBA);
    for (int y = 0; y < h; ++y)
        for (int x = 0; x < w; ++x) {
            uint8_t* p = img->data + (y * w + x) * 4;
            p[0] = static_cast<uint8_t>(x);
            p[1] = static_cast<uint8_t>(y);
            p[2] = 7;
            p[3] = static_cast<uint8_t>(200 + tag);
        }
    return img;
}

// The source coordinates a labelled pixel came from; (-1, -1) for cleared ones.
std::pair<int, int> origin(const VCImage* img, int x, int y) {
    const uint8_t* p = img->data + (y * img->width + x) * 4;
    if (p[0] == 0 && p[1] == 0 && p[2] == 0 && p[3] == 0) return {-1, -1};
    return {p[0], p[1]};
}

// Every pixel (x, y) of `img` came from source pixel from(x, y).
template <typename F>
void expectFrom(const VCImage* img, F from) {
    for (int y = 0; y < img->height; ++y)
        for (int x = 0; x < img->width; ++x)
            EXPECT_EQ(from(x, y), origin(img, x, y)) << x << "," << y;
}

std::vector<uint8_t> sequence(size_t n, int start = 0) {
    std::vector<uint8_t> v(n);
    for (size_t i = 0; i < n; ++i) v[i] = static_cast<uint8_t>(start + i);
    return v;
}

}  // namespace

TEST(VCImageScale, RefusesBadInput) {
    LogCapture log;
    VCImage* src = labelled(4, 4);
    VCImage* dst = VCImage_createEmpty(0, 10, VC_FORMAT_RGBA);
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_scale(nullptr, dst));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_scale(src, nullptr));
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_scale(src, dst));
    EXPECT_TRUE(log.contains(VF_LOG_ERROR, "VCImage_scale: invalid image dimensions (<=0)"));
    EXPECT_TRUE(countErrors(log, "VC_ERROR_INVALID_SIZE", -4));
    dst->width = 2;
    dst->format = VC_FORMAT_NV21;
    log.clear();
    EXPECT_EQ(VC_ERROR_INVALID_PARAM, VCImage_scale(src, dst));
    EXPECT_TRUE(
        log.contains(VF_LOG_ERROR, "VCImage_scale supports only ANDROID_BITMAP format for now"));
    EXPECT_EQ(nullptr, dst->data);

    // A target too large to allocate reports the allocation's own error.
    VCImage* huge = VCImage_createEmpty(40000, 40000, VC_FORMAT_RGBA);
    log.clear();
    EXPECT_EQ(VC_ERROR_INVALID_PARAM, VCImage_scale(src, huge));
    EXPECT_TRUE(log.contains(VF_LOG_ERROR, "VCImage_scale: allocation failed (0 bytes)"));
    EXPECT_EQ(nullptr, huge->data);
    VCImage_destroy(huge);
    VCImage_destroy(src);
    VCImage_destroy(dst);
}

TEST(VCImageScale, SamplesAtPixelCentres) {
    VCImage* src = labelled(5, 4, 1);
    // Downscale 5 -> 3 (factor 0.6) and 4 -> 2: centres 0.5, 1.5, 2.5 land on
    // columns 0, 2, 4 and rows 1, 3.
    VCImage* down = VCImage_createEmpty(3, 2, VC_FORMAT_RGBA);
    ASSERT_EQ(VC_OK, VCImage_scale(src, down));
    ASSERT_NE(nullptr, down->data);
    expectFrom(down, [](int x, int y) { return std::make_pair(2 * x, 2 * y + 1); });
    EXPECT_EQ(201, down->data[3]);

    // Upscale 5 -> 10 doubles every column; 4 -> 6 (factor 1.5) puts the
    // centres 0.5 … 5.5 at source rows 0.33, 1, 1.67, 2.33, 3, 3.67.
    VCImage* up = VCImage_createNew(10, 6, VC_FORMAT_RGBA);
    ASSERT_EQ(VC_OK, VCImage_scale(src, up));
    const int upY[6] = {0, 1, 1, 2, 3, 3};
    expectFrom(up, [&](int x, int y) { return std::make_pair(x / 2, upY[y]); });

    // Same size is a plain copy, also between buffers wrapped without a size field.
    VCImage* same = VCImage_createEmpty(5, 4, VC_FORMAT_RGBA);
    ASSERT_EQ(VC_OK, VCImage_scale(src, same));
    EXPECT_EQ(0, memcmp(src->data, same->data, 80));
    std::vector<uint8_t> copied(80, 0);
    VCImage* in = VCImage_createWrap(src->data, 5, 4, VC_FORMAT_RGBA, 0, 0);
    VCImage* out = VCImage_createWrap(copied.data(), 5, 4, VC_FORMAT_RGBA, 0, 0);
    ASSERT_EQ(VC_OK, VCImage_scale(in, out));
    EXPECT_EQ(0, memcmp(src->data, copied.data(), 80));
    for (VCImage* i : {src, down, up, same, in, out}) VCImage_destroy(i);
}

// Planes of 1- and 2-byte samples sample like RGBA pixels: the same 5x4 -> 10x6
// picture scaled as one 4-byte plane and as 1- and 2-byte planes agrees sample for sample.
TEST(VCImageScale, PlanesOfAnySampleSizeSampleAlike) {
    VCImage* src = labelled(5, 4, 1);
    VCImage* up = VCImage_createNew(10, 6, VC_FORMAT_RGBA);
    ASSERT_EQ(VC_OK, VCImage_scale(src, up));
    for (int step : {1, 2}) {
        // Byte k of every RGBA pixel, gathered into a plane of step-byte samples.
        std::vector<uint8_t> plane(5 * 4 * step), out(10 * 6 * step);
        for (int i = 0; i < 5 * 4 * step; ++i) plane[i] = src->data[(i / step) * 4 + i % step];
        ASSERT_EQ(VC_OK, VCImage_scalePlane(plane.data(), 5, 4, out.data(), 10, 6, step));
        for (int i = 0; i < 10 * 6 * step; ++i)
            ASSERT_EQ(out[i], up->data[(i / step) * 4 + i % step]) << step << " " << i;
    }
    uint8_t byte = 0;
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_scalePlane(nullptr, 1, 1, &byte, 1, 1, 1));
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_scalePlane(&byte, 1, 0, &byte, 1, 1, 1));
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_scalePlane(&byte, 1, 1, &byte, 1, 1, 0));
    VCImage_destroy(src);
    VCImage_destroy(up);
}

TEST(VCImageCrop, RgbAndEvery420Layout) {
    LogCapture log;
    VCImage* src = labelled(6, 5);
    VCImage* dst = VCImage_createEmpty(3, 2, VC_FORMAT_RGBA);
    ASSERT_EQ(VC_OK, VCImage_crop(src, dst, 2, 3));
    expectFrom(dst, [](int x, int y) { return std::make_pair(x + 2, y + 3); });
    VCImage* outside = VCImage_createEmpty(3, 3, VC_FORMAT_RGBA);
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_crop(src, outside, 0, 3));
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_crop(src, outside, 4, 0));
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_crop(src, outside, -1, 0));
    EXPECT_EQ(nullptr, outside->data);
    outside->format = VC_FORMAT_BGRA;
    EXPECT_EQ(VC_ERROR_INVALID_PARAM, VCImage_crop(src, outside, 0, 0));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_crop(nullptr, outside, 0, 0));

    // 8x4 4:2:0 sources, luma 0..31, chroma from 100 on: contiguous, with the
    // chroma plane displaced 8 bytes behind the luma, and displaced without a
    // size field (as bands of a larger frame are wrapped) into a destination
    // displaced the same way.
    struct Layout {
        uint32_t gap;
        bool sized;
    };
    for (uint32_t format : {VC_FORMAT_NV12, VC_FORMAT_NV21, VC_FORMAT_YV12, VC_FORMAT_YUVP}) {
        for (Layout l : {Layout{0, true}, Layout{8, true}, Layout{8, false}}) {
            std::vector<uint8_t> buf(32 + l.gap + 16, 0);
            for (int i = 0; i < 32; ++i) buf[i] = static_cast<uint8_t>(i);
            for (int i = 0; i < 16; ++i) buf[32 + l.gap + i] = static_cast<uint8_t>(100 + i);
            VCImage* yuv = VCImage_createWrap(buf.data(), 8, 4, format,
                                              l.sized ? static_cast<int>(buf.size()) : 0,
                                              l.gap != 0 ? 32 + l.gap : 0);
            std::vector<uint8_t> out(8 + 4 + 4, 0xEE);
            VCImage* part = l.sized ? VCImage_createEmpty(4, 2, format)
                                    : VCImage_createWrap(out.data(), 4, 2, format, 0, 12);
            ASSERT_EQ(VC_OK, VCImage_crop(yuv, part, 2, 2));
            const uint8_t wantLuma[8] = {18, 19, 20, 21, 26, 27, 28, 29};
            EXPECT_EQ(0, memcmp(wantLuma, part->data, 8));
            const uint8_t* chroma = part->data + (l.sized ? 8 : 12);
            if (format == VC_FORMAT_NV12 || format == VC_FORMAT_NV21) {
                // Chroma row 1, bytes 2..5.
                const uint8_t want[4] = {110, 111, 112, 113};
                EXPECT_EQ(0, memcmp(want, chroma, 4));
            } else {
                // Planes of 8 bytes, rows of 4: row 1, column 1, one byte each.
                EXPECT_EQ(105, chroma[0]);
                EXPECT_EQ(113, chroma[2]);
            }
            if (!l.sized) {
                EXPECT_EQ(std::vector<uint8_t>(4, 0xEE), std::vector<uint8_t>(&out[8], &out[12]));
            }
            VCImage_destroy(yuv);
            VCImage_destroy(part);
        }
    }
    // With a size field the planes must lie inside it, wherever the chroma
    // starts: here it overlaps the luma's second half.
    std::vector<uint8_t> plain = sequence(48);
    VCImage* overlapped = VCImage_createWrap(plain.data(), 8, 4, VC_FORMAT_NV12, 32, 16);
    VCImage* piece = VCImage_createEmpty(2, 2, VC_FORMAT_NV12);
    EXPECT_EQ(VC_OK, VCImage_crop(overlapped, piece, 0, 0));
    EXPECT_EQ(16, piece->data[4]);
    overlapped->uvOffset = 24;  // its chroma would run to byte 40
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_crop(overlapped, piece, 0, 0));
    VCImage_destroy(overlapped);
    VCImage_destroy(piece);

    std::vector<uint8_t> buf = sequence(48);
    VCImage* nv21 = VCImage_createWrap(buf.data(), 8, 4, VC_FORMAT_NV21, 48, 0);
    VCImage* odd = VCImage_createEmpty(4, 2, VC_FORMAT_NV21);
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_crop(nv21, odd, 1, 0));
    odd->width = 3;
    VCImage_deallocate(odd);
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_crop(nv21, odd, 0, 0));
    VCImage* grey = VCImage_createWrap(buf.data(), 8, 4, VC_FORMAT_GREY, 32, 0);
    VCImage* greyPart = VCImage_createEmpty(2, 2, VC_FORMAT_GREY);
    log.clear();
    EXPECT_EQ(VC_ERROR_UNSUPPORTED, VCImage_crop(grey, greyPart, 0, 0));
    EXPECT_TRUE(countErrors(log, "VC_ERROR_UNSUPPORTED", -6));
    for (VCImage* i : {src, dst, outside, nv21, odd, grey, greyPart}) VCImage_destroy(i);
}

TEST(VCImageRotate, OrientationsAndPivots) {
    LogCapture log;
    VCImage* img = labelled(4, 2);
    EXPECT_EQ(VC_ERROR_INVALID_PARAM, VCImage_rotate(img, 45));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_rotate(nullptr, 90));

    // 90: a 4x2 image becomes 2x4, its right column on top.
    log.clear();
    ASSERT_EQ(VC_OK, VCImage_rotate(img, 90));
    EXPECT_TRUE(log.contains(VF_LOG_DEBUG,
                             "Rotation parameters: angle = 90, orient = 1, in w/h = 4x2, out w/h = "
                             "2x4, pivot = 2,2"));
    ASSERT_EQ(2, img->width);
    ASSERT_EQ(4, img->height);
    expectFrom(img, [](int x, int y) { return std::make_pair(3 - y, x); });

    // -90 is orientation 3: with w < h the pivot (w, w) brings it back.
    log.clear();
    ASSERT_EQ(VC_OK, VCImage_rotate(img, -90));
    EXPECT_TRUE(log.contains(VF_LOG_DEBUG,
                             "Rotation parameters: angle = -90, orient = 3, in w/h = 2x4, out w/h "
                             "= 4x2, pivot = 2,2"));
    VCImage* fresh = labelled(4, 2);
    EXPECT_EQ(0, memcmp(fresh->data, img->data, 32));

    ASSERT_EQ(VC_OK, VCImage_rotate(img, 360));
    EXPECT_EQ(0, memcmp(fresh->data, img->data, 32));
    ASSERT_EQ(VC_OK, VCImage_rotate(img, 180));
    expectFrom(img, [](int x, int y) { return std::make_pair(3 - x, 1 - y); });

    // 270 with w >= h turns about (h/2, h/2).
    VCImage* wide = labelled(4, 2);
    ASSERT_EQ(VC_OK, VCImage_rotate(wide, 270));
    ASSERT_EQ(2, wide->width);
    ASSERT_EQ(4, wide->height);
    expectFrom(wide, [](int x, int y) { return std::make_pair(y, 1 - x); });

    // 90 with w < h turns about (w/2, w/2): the picture keeps its top rows only.
    VCImage* tall = labelled(2, 4);
    ASSERT_EQ(VC_OK, VCImage_rotate(tall, 90));
    ASSERT_EQ(4, tall->width);
    ASSERT_EQ(2, tall->height);
    expectFrom(tall, [](int x, int y) { return std::make_pair(1 - y, x); });

    // Integer halves: an odd width turned by 180 loses a column.
    VCImage* odd = labelled(3, 2);
    ASSERT_EQ(VC_OK, VCImage_rotate(odd, 180));
    EXPECT_EQ(std::make_pair(1, 1), origin(odd, 0, 0));
    EXPECT_EQ(std::make_pair(0, 1), origin(odd, 1, 0));
    EXPECT_EQ(std::make_pair(-1, -1), origin(odd, 2, 0));

    // A size field beyond the pixels is refused.
    VCImage* big = labelled(2, 2);
    big->size = 20;
    log.clear();
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_rotate(big, 90));
    EXPECT_TRUE(countErrors(log, "VC_ERROR_INVALID_SIZE", -4));
    big->size = 16;
    for (VCImage* i : {img, fresh, wide, tall, odd, big}) VCImage_destroy(i);
}

TEST(VCImageRotate, OtherFormatsGoThroughRgba) {
    LogCapture log;
    // Grey survives the round trip through RGBA exactly.
    std::vector<uint8_t> buf = sequence(8, 10);
    VCImage* grey = VCImage_createWrap(buf.data(), 4, 2, VC_FORMAT_GREY, 8, 0);
    ASSERT_EQ(VC_OK, VCImage_rotate(grey, 90));
    EXPECT_TRUE(log.contains(VF_LOG_WARNING,
                             "Rotation is supported on RGBA images only for now: using temporary "
                             "RGBA copy of this 4x2 'GREY' image"));
    EXPECT_EQ(2, grey->width);
    EXPECT_EQ(4, grey->height);
    const uint8_t want[8] = {13, 17, 12, 16, 11, 15, 10, 14};
    EXPECT_EQ(0, memcmp(want, buf.data(), 8));

    // The first conversion's failure is returned...
    std::vector<uint8_t> packed(6 * 2, 0);
    VCImage* yuyv = VCImage_createWrap(packed.data(), 3, 2, VC_FORMAT_YUYV, 12, 0);
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_rotate(yuyv, 90));
    // A 2x3 4:2:2 image turns 3 wide: the way back takes the odd geometry,
    // as any conversion into an image whose own width is even does.
    VCImage* narrow = VCImage_createWrap(packed.data(), 2, 3, VC_FORMAT_YUYV, 12, 0);
    log.clear();
    EXPECT_EQ(VC_OK, VCImage_rotate(narrow, 90));
    EXPECT_FALSE(countErrors(log, "VC_ERROR_INVALID_SIZE", -4));
    EXPECT_EQ(3, narrow->width);
    EXPECT_EQ(2, narrow->height);
    // Pixels of no known size cannot be rotated.
    VCImage* unknown = VCImage_createWrap(packed.data(), 2, 2, VC_FORMAT_JPEG, 0, 0);
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_rotate(unknown, 90));
    VCImage_destroy(unknown);
    for (VCImage* i : {grey, yuyv, narrow}) VCImage_destroy(i);
}

TEST(VCImageDrawImage, ClipsAndPastes) {
    LogCapture log;
    VCImage* dst = VCImage_createNew(100, 100, VC_FORMAT_RGBA);
    memset(dst->data, 0, dst->size);
    VCImage* src = labelled(10, 10, 3);
    ASSERT_EQ(VC_OK, VCImage_drawImage(src, dst, -20, 0));
    EXPECT_TRUE(log.contains(VF_LOG_WARNING,
                             "In VCImage_drawImage, the source image 10x10 is completely out of "
                             "the destination 100x100 at -20,0"));
    log.clear();
    ASSERT_EQ(VC_OK, VCImage_drawImage(src, dst, -10, 5));
    EXPECT_TRUE(log.contains(VF_LOG_WARNING, "Nothing to draw (lines = 10, cols = 0)"));
    for (uint32_t i = 0; i < dst->size; ++i) ASSERT_EQ(0, dst->data[i]);

    // At (95, 95) a 5x5 block lands in the corner.
    ASSERT_EQ(VC_OK, VCImage_drawImage(src, dst, 95, 95));
    int painted = 0;
    for (int y = 0; y < 100; ++y)
        for (int x = 0; x < 100; ++x) {
            auto o = origin(dst, x, y);
            if (o.first < 0) continue;
            ++painted;
            EXPECT_EQ(std::make_pair(x - 95, y - 95), o);
        }
    EXPECT_EQ(25, painted);

    // A negative offset cuts the source's leading rows and columns.
    memset(dst->data, 0, dst->size);
    ASSERT_EQ(VC_OK, VCImage_drawImage(src, dst, -3, -2));
    EXPECT_EQ(std::make_pair(3, 2), origin(dst, 0, 0));
    EXPECT_EQ(std::make_pair(9, 9), origin(dst, 6, 7));
    EXPECT_EQ(std::make_pair(-1, -1), origin(dst, 7, 0));
    EXPECT_EQ(std::make_pair(-1, -1), origin(dst, 0, 8));

    VCImage* bgra = VCImage_createNew(4, 4, VC_FORMAT_BGRA);
    EXPECT_EQ(VC_ERROR_INVALID_PARAM, VCImage_drawImage(bgra, dst, 0, 0));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_drawImage(nullptr, dst, 0, 0));
    for (VCImage* i : {dst, src, bgra}) VCImage_destroy(i);
}

TEST(VCImageDrawImage, Yuv420Pastes) {
    LogCapture log;
    for (uint32_t format : {VC_FORMAT_NV21, VC_FORMAT_YV12, VC_FORMAT_NV12, VC_FORMAT_YUVP}) {
        // 4x2 source (luma 1..8, chroma 11..14) into an 8x4 destination at
        // (2, 2); the last two with their chroma planes displaced behind a
        // gap and no size field, as bands of a larger frame are wrapped.
        const bool displaced = format == VC_FORMAT_NV12 || format == VC_FORMAT_YUVP;
        const uint32_t gap = displaced ? 4 : 0;
        std::vector<uint8_t> s = {1, 2, 3, 4, 5, 6, 7, 8, 0, 0, 0, 0, 11, 12, 13, 14};
        if (!displaced) s.erase(s.begin() + 8, s.begin() + 12);
        std::vector<uint8_t> d(48 + gap, 0);
        VCImage* src = displaced ? VCImage_createWrap(s.data(), 4, 2, format, 0, 8 + gap)
                                 : VCImage_createWrap(s.data(), 4, 2, format, 12, 0);
        VCImage* dst = displaced ? VCImage_createWrap(d.data(), 8, 4, format, 0, 32 + gap)
                                 : VCImage_createWrap(d.data(), 8, 4, format, 48, 0);
        ASSERT_EQ(VC_OK, VCImage_drawImage(src, dst, 2, 2));
        const uint8_t row2[8] = {0, 0, 1, 2, 3, 4, 0, 0};
        const uint8_t row3[8] = {0, 0, 5, 6, 7, 8, 0, 0};
        EXPECT_EQ(0, memcmp(row2, d.data() + 16, 8));
        EXPECT_EQ(0, memcmp(row3, d.data() + 24, 8));
        EXPECT_EQ(std::vector<uint8_t>(gap, 0), std::vector<uint8_t>(&d[32], &d[32 + gap]));
        if (format == VC_FORMAT_NV21 || format == VC_FORMAT_NV12) {
            // Chroma row 1 of the destination, bytes 2..5.
            const uint8_t want[16] = {0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 11, 12, 13, 14, 0, 0};
            EXPECT_EQ(0, memcmp(want, d.data() + 32 + gap, 16));
        } else {
            // First plane 11 12, second 13 14; destination planes of 8, rows of 4.
            const uint8_t want[16] = {0, 0, 0, 0, 0, 11, 12, 0, 0, 0, 0, 0, 0, 13, 14, 0};
            EXPECT_EQ(0, memcmp(want, d.data() + 32 + gap, 16));
        }
        log.clear();
        EXPECT_EQ(VC_ERROR_UNSUPPORTED, VCImage_drawImage(src, dst, 1, 0));
        EXPECT_TRUE(
            log.contains(VF_LOG_ERROR, "Unsupported dimensions for YUV420: 4x2 offset 1,0"));
        EXPECT_TRUE(countErrors(log, "VC_ERROR_UNSUPPORTED", -6));
        VCImage_destroy(src);
        VCImage_destroy(dst);
    }
    std::vector<uint8_t> g(16, 1);
    VCImage* grey = VCImage_createWrap(g.data(), 4, 4, VC_FORMAT_GREY, 16, 0);
    EXPECT_EQ(VC_ERROR_UNSUPPORTED, VCImage_drawImage(grey, grey, 0, 0));
    VCImage_destroy(grey);
}
