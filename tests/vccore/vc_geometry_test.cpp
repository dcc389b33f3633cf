// Scaling, cropping, rotation and pasting: refusals and the exact pixels moved.
#include <gtest/gtest.h>
#include <string.h>

#include <string>
#include <vector>

#include "support/image_ptr.h"
#include "vccore/vc_geometry.h"

namespace {

using Bytes = std::vector<uint8_t>;
using Origin = std::pair<int, int>;

// An owning RGBA image whose pixel (x, y) reads (x, y, 7, 200 + tag).
ImagePtr labelled(int w, int h, int tag = 0) {
    ImagePtr img(VCImage_createNew(w, h, VC_FORMAT_RGBA));
    for (int y = 0; y < h; ++y)
        for (int x = 0; x < w; ++x) {
            uint8_t* p = img->data + (y * w + x) * 4;
            p[0] = x, p[1] = y, p[2] = 7, p[3] = 200 + tag;
        }
    return img;
}

// The source coordinates a labelled pixel came from; (-1, -1) for cleared ones.
Origin origin(const ImagePtr& img, int x, int y) {
    const uint8_t* p = img->data + (y * img->width + x) * 4;
    if (p[0] == 0 && p[1] == 0 && p[2] == 0 && p[3] == 0) return {-1, -1};
    return {p[0], p[1]};
}

// Every pixel (x, y) of `img`, a w x h image, came from source pixel from(x, y).
template <typename F>
void expectFrom(const ImagePtr& img, int w, int h, F from) {
    ASSERT_EQ(w * 100 + h, img->width * 100 + img->height);
    for (int y = 0; y < h; ++y)
        for (int x = 0; x < w; ++x) ASSERT_EQ(from(x, y), origin(img, x, y)) << x << "," << y;
}

Bytes sequence(size_t n, int start = 0) {
    Bytes v(n);
    for (size_t i = 0; i < n; ++i) v[i] = static_cast<uint8_t>(start + i);
    return v;
}

TEST(VCImageScale, SamplesAtPixelCentres) {
    ImagePtr src = labelled(5, 4, 1);
    // 5 -> 3 (factor 0.6) and 4 -> 2: centres 0.5, 1.5, 2.5 land on columns
    // 0, 2, 4 and rows 1, 3; the destination gets a buffer of its own.
    ImagePtr down(VCImage_createEmpty(3, 2, VC_FORMAT_RGBA));
    ASSERT_EQ(VC_OK, VCImage_scale(src.get(), down.get()));
    expectFrom(down, 3, 2, [](int x, int y) { return Origin(2 * x, 2 * y + 1); });
    EXPECT_EQ(201, down->data[3]);
    // 5 -> 10 doubles every column; 4 -> 6 (1.5) puts the centres at source
    // rows 0.33, 1, 1.67, 2.33, 3, 3.67.
    ImagePtr up(VCImage_createNew(10, 6, VC_FORMAT_RGBA));
    ASSERT_EQ(VC_OK, VCImage_scale(src.get(), up.get()));
    const int upY[6] = {0, 1, 1, 2, 3, 3};
    expectFrom(up, 10, 6, [&](int x, int y) { return Origin(x / 2, upY[y]); });
    // Same size is a plain copy, also between buffers wrapped without a size field.
    Bytes copied(80, 0);
    ImagePtr out = VCImageTest_wrap(copied.data(), 5, 4, VC_FORMAT_RGBA);
    ASSERT_EQ(VC_OK,
              VCImage_scale(VCImageTest_wrap(src->data, 5, 4, VC_FORMAT_RGBA).get(), out.get()));
    EXPECT_EQ(VCImageTest_bytes(*src), copied);
    // Refusals leave the destination without a buffer.
    ImagePtr empty(VCImage_createEmpty(0, 10, VC_FORMAT_RGBA));
    ImagePtr nv21(VCImage_createEmpty(2, 2, VC_FORMAT_NV21));
    ImagePtr huge(VCImage_createEmpty(40000, 40000, VC_FORMAT_RGBA));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_scale(nullptr, empty.get()));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_scale(src.get(), nullptr));
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_scale(src.get(), empty.get()));
    EXPECT_EQ(VC_ERROR_INVALID_PARAM, VCImage_scale(src.get(), nv21.get()));
    EXPECT_EQ(VC_ERROR_INVALID_PARAM, VCImage_scale(src.get(), huge.get()));
    EXPECT_EQ(nullptr, nv21->data);
    EXPECT_EQ(nullptr, huge->data);
}

// Planes of 1- and 2-byte samples sample like RGBA pixels: the same 5x4 -> 10x6
// picture scaled as one 4-byte plane and as 1- and 2-byte planes agrees sample for sample.
TEST(VCImageScale, PlanesOfAnySampleSizeSampleAlike) {
    ImagePtr src = labelled(5, 4, 1);
    ImagePtr up(VCImage_createNew(10, 6, VC_FORMAT_RGBA));
    ASSERT_EQ(VC_OK, VCImage_scale(src.get(), up.get()));
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
}

TEST(VCImageCrop, RgbAndEvery420Layout) {
    ImagePtr src = labelled(6, 5);
    ImagePtr dst(VCImage_createEmpty(3, 2, VC_FORMAT_RGBA));
    ASSERT_EQ(VC_OK, VCImage_crop(src.get(), dst.get(), 2, 3));
    expectFrom(dst, 3, 2, [](int x, int y) { return Origin(x + 2, y + 3); });
    ImagePtr outside(VCImage_createEmpty(3, 3, VC_FORMAT_RGBA));
    for (auto at : {Origin(0, 3), {4, 0}, {-1, 0}})
        EXPECT_EQ(VC_ERROR_INVALID_SIZE,
                  VCImage_crop(src.get(), outside.get(), at.first, at.second));
    EXPECT_EQ(nullptr, outside->data);
    outside->format = VC_FORMAT_BGRA;
    EXPECT_EQ(VC_ERROR_INVALID_PARAM, VCImage_crop(src.get(), outside.get(), 0, 0));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_crop(nullptr, outside.get(), 0, 0));

    // 8x4 4:2:0 sources, luma 0..31, chroma from 100 on: contiguous, with the
    // chroma 8 bytes behind the luma, and displaced without a size field (as
    // bands of a larger frame are wrapped) into a destination displaced alike.
    for (uint32_t format : {VC_FORMAT_NV12, VC_FORMAT_NV21, VC_FORMAT_YV12, VC_FORMAT_YUVP}) {
        for (auto l : {std::make_pair(0u, true), {8u, true}, {8u, false}}) {
            const uint32_t gap = l.first;
            const bool sized = l.second;
            Bytes buf(32 + gap + 16, 0), out(16, 0xEE);
            for (int i = 0; i < 32; ++i) buf[i] = i;
            for (int i = 0; i < 16; ++i) buf[32 + gap + i] = 100 + i;
            ImagePtr yuv =
                VCImageTest_wrap(buf.data(), 8, 4, format, sized ? static_cast<int>(buf.size()) : 0,
                                 gap ? 32 + gap : 0);
            ImagePtr part(sized ? VCImage_createEmpty(4, 2, format)
                                : VCImage_createWrap(out.data(), 4, 2, format, 0, 12));
            ASSERT_EQ(VC_OK, VCImage_crop(yuv.get(), part.get(), 2, 2));
            const uint8_t* chroma = part->data + (sized ? 8 : 12);
            // Semi-planar: chroma row 1, bytes 2..5. Planar: planes of 8 bytes,
            // rows of 4: row 1, column 1, one byte each.
            const bool semi = format == VC_FORMAT_NV12 || format == VC_FORMAT_NV21;
            EXPECT_EQ(Bytes({18, 19, 20, 21, 26, 27, 28, 29}), Bytes(part->data, part->data + 8));
            EXPECT_EQ(semi ? Bytes({110, 111, 112, 113}) : Bytes({105, 113}),
                      semi ? Bytes(chroma, chroma + 4) : Bytes({chroma[0], chroma[2]}))
                << VCImageTest_fourcc(format) << " gap " << gap;
            EXPECT_EQ(Bytes(4, 0xEE), Bytes(&out[8], &out[12]));  // the gap behind the luma
        }
    }
    // With a size field the planes must lie inside it, wherever the chroma
    // starts: here it overlaps the luma's second half.
    Bytes plain = sequence(48);
    ImagePtr overlapped = VCImageTest_wrap(plain.data(), 8, 4, VC_FORMAT_NV12, 32, 16);
    ImagePtr piece(VCImage_createEmpty(2, 2, VC_FORMAT_NV12));
    EXPECT_EQ(VC_OK, VCImage_crop(overlapped.get(), piece.get(), 0, 0));
    EXPECT_EQ(16, piece->data[4]);
    overlapped->uvOffset = 24;  // its chroma would run to byte 40
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_crop(overlapped.get(), piece.get(), 0, 0));
    // Odd offsets and sizes of 4:2:0, and grey, are refused.
    ImagePtr nv21 = VCImageTest_wrap(plain.data(), 8, 4, VC_FORMAT_NV21, 48);
    ImagePtr odd(VCImage_createEmpty(4, 2, VC_FORMAT_NV21));
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_crop(nv21.get(), odd.get(), 1, 0));
    odd->width = 3;
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_crop(nv21.get(), odd.get(), 0, 0));
    ImagePtr greyPart(VCImage_createEmpty(2, 2, VC_FORMAT_GREY));
    EXPECT_EQ(VC_ERROR_UNSUPPORTED,
              VCImage_crop(VCImageTest_wrap(plain.data(), 8, 4, VC_FORMAT_GREY, 32).get(),
                           greyPart.get(), 0, 0));
}

TEST(VCImageRotate, OrientationsAndPivots) {
    struct Row {
        int w, h, angle, outW, outH;
        Origin (*from)(int x, int y);
    } rows[] = {
        // 90: the right column on top.
        {4, 2, 90, 2, 4, [](int x, int y) { return Origin(3 - y, x); }},
        {4, 2, 180, 4, 2, [](int x, int y) { return Origin(3 - x, 1 - y); }},
        // 270 with w >= h turns about (h/2, h/2).
        {4, 2, 270, 2, 4, [](int x, int y) { return Origin(y, 1 - x); }},
        {4, 2, 360, 4, 2, [](int x, int y) { return Origin(x, y); }},
        // 90 with w < h turns about (w/2, w/2): the picture keeps its top rows only.
        {2, 4, 90, 4, 2, [](int x, int y) { return Origin(1 - y, x); }},
    };
    for (const Row& r : rows) {
        ImagePtr img = labelled(r.w, r.h);
        ASSERT_EQ(VC_OK, VCImage_rotate(img.get(), r.angle)) << r.angle;
        SCOPED_TRACE(std::to_string(r.w) + "x" + std::to_string(r.h) + " by " +
                     std::to_string(r.angle));
        expectFrom(img, r.outW, r.outH, r.from);
    }
    // -90 is orientation 3: with w < h the pivot (w, w) brings 90 back.
    ImagePtr img = labelled(4, 2);
    ASSERT_EQ(VC_OK, VCImage_rotate(img.get(), 90));
    ASSERT_EQ(VC_OK, VCImage_rotate(img.get(), -90));
    EXPECT_EQ(VCImageTest_bytes(*labelled(4, 2)), VCImageTest_bytes(*img));
    // Integer halves: an odd width turned by 180 loses a column.
    ImagePtr odd = labelled(3, 2);
    ASSERT_EQ(VC_OK, VCImage_rotate(odd.get(), 180));
    EXPECT_EQ(Origin(1, 1), origin(odd, 0, 0));
    EXPECT_EQ(Origin(0, 1), origin(odd, 1, 0));
    EXPECT_EQ(Origin(-1, -1), origin(odd, 2, 0));
    EXPECT_EQ(VC_ERROR_INVALID_PARAM, VCImage_rotate(img.get(), 45));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_rotate(nullptr, 90));
    img->size = 20;  // a size field beyond the pixels
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_rotate(img.get(), 90));
    img->size = 16;
}

TEST(VCImageRotate, OtherFormatsGoThroughRgba) {
    // Grey survives the round trip through RGBA exactly.
    Bytes buf = sequence(8, 10);
    ImagePtr grey = VCImageTest_wrap(buf.data(), 4, 2, VC_FORMAT_GREY, 8);
    ASSERT_EQ(VC_OK, VCImage_rotate(grey.get(), 90));
    EXPECT_EQ("2x4 GREY wrapped 1 size 8 uv 0", VCImageTest_record(grey.get()));
    EXPECT_EQ(Bytes({13, 17, 12, 16, 11, 15, 10, 14}), buf);
    // The first conversion's failure is returned; a 2x3 4:2:2 image turns 3
    // wide, and the way back takes the odd geometry, as any conversion into an
    // image whose own width is even does.
    Bytes packed(12, 0);
    EXPECT_EQ(VC_ERROR_INVALID_SIZE,
              VCImage_rotate(VCImageTest_wrap(packed.data(), 3, 2, VC_FORMAT_YUYV, 12).get(), 90));
    ImagePtr narrow = VCImageTest_wrap(packed.data(), 2, 3, VC_FORMAT_YUYV, 12);
    EXPECT_EQ(VC_OK, VCImage_rotate(narrow.get(), 90));
    EXPECT_EQ(3 * 100 + 2, narrow->width * 100 + narrow->height);
    // Pixels of no known size cannot be rotated.
    EXPECT_EQ(VC_ERROR_INVALID_SIZE,
              VCImage_rotate(VCImageTest_wrap(packed.data(), 2, 2, VC_FORMAT_JPEG).get(), 90));
}

TEST(VCImageDrawImage, ClipsAndPastes) {
    ImagePtr dst(VCImage_createNew(100, 100, VC_FORMAT_RGBA));
    memset(dst->data, 0, dst->size);
    ImagePtr src = labelled(10, 10, 3);
    // Entirely outside, or a clip that leaves nothing: not an error, nothing drawn.
    ASSERT_EQ(VC_OK, VCImage_drawImage(src.get(), dst.get(), -20, 0));
    ASSERT_EQ(VC_OK, VCImage_drawImage(src.get(), dst.get(), -10, 5));
    EXPECT_EQ(Bytes(dst->size, 0), VCImageTest_bytes(*dst));
    // At (95, 95) a 5x5 block lands in the corner.
    ASSERT_EQ(VC_OK, VCImage_drawImage(src.get(), dst.get(), 95, 95));
    expectFrom(dst, 100, 100, [](int x, int y) {
        return x >= 95 && y >= 95 ? Origin(x - 95, y - 95) : Origin(-1, -1);
    });
    // A negative offset cuts the source's leading rows and columns.
    memset(dst->data, 0, dst->size);
    ASSERT_EQ(VC_OK, VCImage_drawImage(src.get(), dst.get(), -3, -2));
    expectFrom(dst, 100, 100,
               [](int x, int y) { return x < 7 && y < 8 ? Origin(x + 3, y + 2) : Origin(-1, -1); });
    ImagePtr bgra(VCImage_createNew(4, 4, VC_FORMAT_BGRA));
    EXPECT_EQ(VC_ERROR_INVALID_PARAM, VCImage_drawImage(bgra.get(), dst.get(), 0, 0));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_drawImage(nullptr, dst.get(), 0, 0));
    Bytes g(16, 1);
    ImagePtr grey = VCImageTest_wrap(g.data(), 4, 4, VC_FORMAT_GREY, 16);
    EXPECT_EQ(VC_ERROR_UNSUPPORTED, VCImage_drawImage(grey.get(), grey.get(), 0, 0));
}

TEST(VCImageDrawImage, Yuv420Pastes) {
    for (uint32_t format : {VC_FORMAT_NV21, VC_FORMAT_YV12, VC_FORMAT_NV12, VC_FORMAT_YUVP}) {
        // 4x2 source (luma 1..8, chroma 11..14) into an 8x4 destination at
        // (2, 2); NV12 and YUVP with their chroma planes displaced behind a gap
        // and no size field, as bands of a larger frame are wrapped.
        const bool displaced = format == VC_FORMAT_NV12 || format == VC_FORMAT_YUVP;
        const uint32_t gap = displaced ? 4 : 0;
        Bytes s = {1, 2, 3, 4, 5, 6, 7, 8, 0, 0, 0, 0, 11, 12, 13, 14};
        if (!displaced) s.erase(s.begin() + 8, s.begin() + 12);
        Bytes d(48 + gap, 0);
        ImagePtr src =
            VCImageTest_wrap(s.data(), 4, 2, format, displaced ? 0 : 12, displaced ? 8 + gap : 0);
        ImagePtr dst =
            VCImageTest_wrap(d.data(), 8, 4, format, displaced ? 0 : 48, displaced ? 32 + gap : 0);
        ASSERT_EQ(VC_OK, VCImage_drawImage(src.get(), dst.get(), 2, 2));
        Bytes want(32, 0);
        for (int i = 0; i < 4; ++i) want[18 + i] = 1 + i, want[26 + i] = 5 + i;
        want.insert(want.end(), gap, 0);
        // Semi-planar: chroma row 1 of the destination, bytes 2..5. Planar:
        // the first plane's 11 12, the second's 13 14, planes of 8, rows of 4.
        const bool semi = format == VC_FORMAT_NV21 || format == VC_FORMAT_NV12;
        const Bytes chroma = semi ? Bytes{0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 11, 12, 13, 14, 0, 0}
                                  : Bytes{0, 0, 0, 0, 0, 11, 12, 0, 0, 0, 0, 0, 0, 13, 14, 0};
        want.insert(want.end(), chroma.begin(), chroma.end());
        EXPECT_EQ(want, d) << VCImageTest_fourcc(format);
        EXPECT_EQ(VC_ERROR_UNSUPPORTED, VCImage_drawImage(src.get(), dst.get(), 1, 0));
    }
}

}  // namespace
