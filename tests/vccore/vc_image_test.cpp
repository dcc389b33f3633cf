// The image record (formats, sizes, states, ownership, clone, the error
// names) and its geometry: scaling, cropping, rotation and pasting, their
// refusals and the exact pixels moved.
#include <gtest/gtest.h>
#include <stdint.h>
#include <string.h>

#include <string>
#include <vector>

#include "support/image_ptr.h"
#include "vccore/vc_geometry.h"
#include "vccore/vc_image.h"

namespace {

using Bytes = std::vector<unsigned char>;

// The FourCCs travel to Java and to the device libraries: each must be its
// four letters in memory order. Families and sizes of a 3x2 image with them.
TEST(VcImage, FormatTable) {
    const struct {
        uint32_t format;
        const char* name;
        uint32_t size3x2;
        int family;  // 0 RGB, 1 YUV, 2 YUV 4:2:0
    } rows[] = {
        {VC_FORMAT_RGBA, "RGBA", 24, 0}, {VC_FORMAT_BGRA, "BGRA", 24, 0},
        {VC_FORMAT_ARGB, "ARGB", 24, 0}, {VC_FORMAT_ABGR, "ABGR", 24, 0},
        {VC_FORMAT_RGB8, "RGB8", 18, 0}, {VC_FORMAT_BGR8, "BGR8", 18, 0},
        {VC_FORMAT_GREY, "GREY", 6, 1},  {VC_FORMAT_YUYV, "YUYV", 12, 1},
        {VC_FORMAT_YVYU, "YVYU", 12, 1}, {VC_FORMAT_NV12, "NV12", 9, 2},
        {VC_FORMAT_NV21, "NV21", 9, 2},  {VC_FORMAT_YV12, "YV12", 9, 2},
        {VC_FORMAT_YUVP, "YUVP", 9, 2},
    };
    for (const auto& r : rows) {
        EXPECT_EQ(r.name, VCImageTest_fourcc(r.format));
        EXPECT_EQ(r.size3x2, VCImage_requiredSize(3, 2, r.format)) << r.name;
        EXPECT_EQ(r.family == 0, VCImage_isRGB(r.format) != 0) << r.name;
        EXPECT_EQ(r.family >= 1, VCImage_isYUV(r.format) != 0) << r.name;
        EXPECT_EQ(r.family == 2, VCImage_isYUV420(r.format) != 0) << r.name;
    }
    EXPECT_EQ("JPEG", VCImageTest_fourcc(VC_FORMAT_JPEG));
    EXPECT_FALSE(VCImage_isRGB(VC_FORMAT_JPEG) || VCImage_isYUV(VC_FORMAT_JPEG) ||
                 VCImage_isYUV420(VC_FORMAT_JPEG) || VCImage_isYUV(0));
}

TEST(VcImage, RequiredSizes) {
    const struct {
        int w, h;
        uint32_t format, size;
    } rows[] = {
        {3, 3, VC_FORMAT_YV12, 14},  // half the sum, not per-plane rounding: (27 + 1) / 2
        {1, 1, VC_FORMAT_NV12, 2},
        {0, 10, VC_FORMAT_RGBA, 0},
        {10, -1, VC_FORMAT_RGBA, 0},
        {10, 10, 0x12345678, 0},
        {10, 10, VC_FORMAT_JPEG, 0},
        // Byte counts beyond 32 bits are no sizes, not wrapped values.
        {0x3FFFFFFF, 1, VC_FORMAT_RGBA, 0xFFFFFFFCu},
        {0x40000000, 1, VC_FORMAT_RGBA, 0},
        {46341, 46341, VC_FORMAT_NV21, 0},  // 3·w·h > 2^32
        {INT32_MAX, INT32_MAX, VC_FORMAT_GREY, 0},
    };
    for (const auto& r : rows)
        EXPECT_EQ(r.size, VCImage_requiredSize(r.w, r.h, r.format)) << r.w << "x" << r.h;
    EXPECT_EQ(0u, VCImage_size(nullptr));
    ImagePtr image(VCImage_createEmpty(4, 4, VC_FORMAT_NV12));
    EXPECT_EQ(24u, VCImage_size(image.get()));
    image->size = 100;  // the field wins when set
    EXPECT_EQ(100u, VCImage_size(image.get()));
}

int gDestroyed = 0;
class CountingImage : public VCImage {
public:
    ~CountingImage() override { ++gDestroyed; }
};

TEST(VcImage, CreateAllocateWrapAndRelease) {
    ImagePtr fresh(VCImage_createNew(5, 3, VC_FORMAT_RGB8));
    EXPECT_EQ("5x3 RGB8 wrapped 0 size 45 uv 0", VCImageTest_record(fresh.get()));
    memset(fresh->data, 0xAB, fresh->size);  // the whole buffer is ours (ASan checks)
    for (auto wh : {std::make_pair(0, 3), {70000, 70000}})
        EXPECT_EQ(nullptr, ImagePtr(VCImage_createNew(wh.first, wh.second, VC_FORMAT_RGBA)));
    EXPECT_EQ(nullptr, ImagePtr(VCImage_createNew(3, 3, 0)));
    // Null data: a header only, whatever size and offset were asked for.
    EXPECT_EQ(
        "640x480 NV21 no data wrapped 0 size 0 uv 0",
        VCImageTest_record(VCImageTest_wrap(nullptr, 640, 480, VC_FORMAT_NV21, 1000, 64).get()));
    Bytes mine(100, 1);
    // Negative sizes are not taken; the caller's memory stays untouched.
    EXPECT_EQ(
        "4x4 RGBA wrapped 1 size 0 uv 12",
        VCImageTest_record(VCImageTest_wrap(mine.data(), 4, 4, VC_FORMAT_RGBA, -5, 12).get()));

    ImagePtr image(VCImage_createEmpty(3, 3, VC_FORMAT_NV21));
    EXPECT_EQ("3x3 NV21 no data wrapped 0 size 0 uv 0", VCImageTest_record(image.get()));
    EXPECT_EQ(14, VCImage_allocate(image.get()));
    EXPECT_EQ(14u, image->size);
    unsigned char* owned = image->data;
    EXPECT_EQ(14, VCImage_allocate(image.get()));  // already has a buffer: nothing new
    EXPECT_EQ(owned, image->data);
    // Wrapping frees the owned buffer first (ASan would report a leak otherwise).
    EXPECT_EQ(14, VCImage_wrap(image.get(), mine.data(), 0, 0));
    EXPECT_EQ("3x3 NV21 wrapped 1 size 0 uv 0", VCImageTest_record(image.get()));
    EXPECT_EQ(50, VCImage_wrap(image.get(), mine.data(), 50, 20));
    // Allocate on a wrapping image allocates nothing and returns the wrapped size.
    EXPECT_EQ(50, VCImage_allocate(image.get()));
    EXPECT_EQ(mine.data(), image->data);
    EXPECT_EQ("3x3 NV21 wrapped 1 size 50 uv 20", VCImageTest_record(image.get()));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_wrap(image.get(), nullptr, 4, 0));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_wrap(nullptr, mine.data(), 4, 0));
    VCImage_deallocate(image.get());  // the geometry stays
    EXPECT_EQ("3x3 NV21 no data wrapped 0 size 0 uv 0", VCImageTest_record(image.get()));
    EXPECT_EQ(Bytes(100, 1), mine);
    EXPECT_EQ(14, VCImage_allocate(image.get()));
    VCImage_reset(image.get());
    EXPECT_EQ("0x0      no data wrapped 0 size 0 uv 0", VCImageTest_record(image.get()));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_allocate(nullptr));
    ImagePtr unknown(VCImage_createEmpty(4, 4, 0x20202020));
    EXPECT_EQ(VC_ERROR_INVALID_PARAM, VCImage_allocate(unknown.get()));
    VCImage_reset(nullptr);
    VCImage_deallocate(nullptr);
    VCImage_destroy(nullptr);

    // Destroy runs the record's virtual destructor.
    gDestroyed = 0;
    VCImage* counting = new CountingImage;
    counting->width = counting->height = 2;
    counting->format = VC_FORMAT_RGBA;
    ASSERT_EQ(16, VCImage_allocate(counting));
    VCImage_destroy(counting);
    EXPECT_EQ(1, gDestroyed);
}

TEST(VcImage, OversizedGeometries) {
    // No 32-bit size at all: nothing to allocate, nothing to report from a wrap.
    // (Their allocations' statuses: the image core's table of lines.)
    ImagePtr huge(VCImage_createEmpty(70000, 70000, VC_FORMAT_RGBA));
    unsigned char byte = 0;
    EXPECT_EQ(0, VCImage_wrap(huge.get(), &byte, 0, 0));
    // A size that fits 32 bits but not the int result.
    ImagePtr large(VCImage_createEmpty(30000, 30000, VC_FORMAT_RGBA));
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_wrap(large.get(), &byte, 0, 0));
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_allocate(large.get()));  // wrapping, size unknown
}

TEST(VcImage, CloneGathersDisplacedChroma) {
    // Luma, 6 bytes of padding, then chroma: a camera buffer with a plane gap.
    Bytes buffer(4 * 2 + 6 + 4);
    for (size_t i = 0; i < buffer.size(); ++i) buffer[i] = static_cast<unsigned char>(i + 1);
    ImagePtr src = VCImageTest_wrap(buffer.data(), 4, 2, VC_FORMAT_NV21, 18, 14);
    ImagePtr copy(VCImage_clone(src.get()));
    ASSERT_NE(nullptr, copy);
    EXPECT_EQ("4x2 NV21 wrapped 0 size 12 uv 0", VCImageTest_record(copy.get()));
    Bytes want = buffer;
    want.erase(want.begin() + 8, want.begin() + 14);
    EXPECT_EQ(want, VCImageTest_bytes(*copy));
    // A displaced chroma plane is read only inside a size field that is set
    // (17 < 14 + 4); without one the offset is trusted.
    src->size = 17;
    EXPECT_EQ(nullptr, ImagePtr(VCImage_clone(src.get())));
    src->size = 0;
    copy.reset(VCImage_clone(src.get()));
    ASSERT_NE(nullptr, copy);
    EXPECT_EQ(want, VCImageTest_bytes(*copy));
    // Odd sizes: (3·w·h + 1) / 2 bytes.
    Bytes odd(16, 9);
    copy.reset(VCImage_clone(VCImageTest_wrap(odd.data(), 3, 3, VC_FORMAT_NV12, 0, 12).get()));
    EXPECT_EQ("3x3 NV12 wrapped 0 size 14 uv 0", VCImageTest_record(copy.get()));

    ImagePtr rgb = VCImageTest_random(3, 2, VC_FORMAT_BGR8, 7);
    copy.reset(VCImage_clone(rgb.get()));
    ASSERT_NE(nullptr, copy);
    EXPECT_EQ(VCImageTest_bytes(*rgb), VCImageTest_bytes(*copy));
    EXPECT_EQ("3x2 BGR8 no data wrapped 0 size 0 uv 0",
              VCImageTest_record(ImagePtr(VCImage_cloneHeader(rgb.get())).get()));
    EXPECT_EQ(nullptr, VCImage_clone(nullptr));
    EXPECT_EQ(nullptr, VCImage_cloneHeader(nullptr));
    EXPECT_EQ(nullptr,
              ImagePtr(VCImage_clone(ImagePtr(VCImage_createEmpty(0, 0, VC_FORMAT_RGBA)).get())));
}

// The names the log lines print for the codes the image core's own table of
// lines does not reach; a code without a name is reported as unknown.
TEST(VcImage, ErrorNames) {
    EXPECT_EQ("VC_ERROR_ALLOC_FAILED VC_ERROR_INVALID_STATE VC_ERROR_UNKNOWN",
              std::string(VCError_name(-5)) + " " + VCError_name(-7) + " " + VCError_name(-10));
}

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
