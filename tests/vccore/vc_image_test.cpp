// The image record: formats, sizes, states, ownership, clone and the error names.
#include <gtest/gtest.h>
#include <stdint.h>
#include <string.h>

#include <vector>

#include "support/image_ptr.h"
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
    ImagePtr huge(VCImage_createEmpty(70000, 70000, VC_FORMAT_RGBA));
    EXPECT_EQ(VC_ERROR_INVALID_PARAM, VCImage_allocate(huge.get()));
    EXPECT_EQ(nullptr, huge->data);
    unsigned char byte = 0;
    EXPECT_EQ(0, VCImage_wrap(huge.get(), &byte, 0, 0));
    // A size that fits 32 bits but not the int result.
    ImagePtr large(VCImage_createEmpty(30000, 30000, VC_FORMAT_RGBA));
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_allocate(large.get()));
    EXPECT_EQ(nullptr, large->data);
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

TEST(VcImage, ErrorNames) {
    const char* names[] = {
        "VC_ERROR_UNKNOWN",       "VC_ERROR_NULL_PARAM",   "VC_ERROR_INVALID_PARAM",
        "VC_ERROR_INVALID_SIZE",  "VC_ERROR_ALLOC_FAILED", "VC_ERROR_UNSUPPORTED",
        "VC_ERROR_INVALID_STATE", "VC_ERROR_IO_FAILED",    "VC_ERROR_CODEC_FAILED"};
    for (int i = 0; i < 9; ++i) EXPECT_STREQ(names[i], VCError_name(-1 - i));
    EXPECT_STREQ("VC_ERROR_NOT_IMPLEMENTED", VCError_name(-42));
    EXPECT_STREQ("VC_ERROR_UNKNOWN", VCError_name(-10));
}

}  // namespace
