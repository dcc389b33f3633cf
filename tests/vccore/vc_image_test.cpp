// The image record: sizes, states, ownership, clone, predicates and the error lines.
#include <gtest/gtest.h>
#include <stdint.h>
#include <string.h>

#include <vector>

#include "support/log_capture.h"
#include "vc_error_lines.h"
#include "vc_image_layout.h"
#include "vccore/vc_image.h"

namespace {

const uint32_t kAll[] = {VC_FORMAT_RGBA, VC_FORMAT_BGRA, VC_FORMAT_ARGB, VC_FORMAT_ABGR,
                         VC_FORMAT_RGB8, VC_FORMAT_BGR8, VC_FORMAT_GREY, VC_FORMAT_YUYV,
                         VC_FORMAT_YVYU, VC_FORMAT_NV12, VC_FORMAT_NV21, VC_FORMAT_YV12,
                         VC_FORMAT_YUVP};

int gDestroyed = 0;
class CountingImage : public VCImage {
public:
    ~CountingImage() override { ++gDestroyed; }
};

}  // namespace

TEST(VcImage, FourCCsSpellTheirNames) {
    // The FourCCs travel to Java and to the device libraries: each must be its
    // four letters in memory order.
    const char* names = "RGBABGRAARGBABGRRGB8BGR8GREYYUYVYVYUNV12NV21YV12YUVP";
    for (size_t i = 0; i < 13; ++i) EXPECT_EQ(0, memcmp(&kAll[i], names + 4 * i, 4)) << i;
    EXPECT_EQ(0x4745504Au, VC_FORMAT_JPEG);
}

TEST(VcImage, RequiredSizes) {
    const uint32_t expected[] = {24, 24, 24, 24, 18, 18, 6, 12, 12, 9, 9, 9, 9};
    for (size_t i = 0; i < 13; ++i)
        EXPECT_EQ(expected[i], VCImage_requiredSize(3, 2, kAll[i])) << i;
    // Half the sum, not per-plane rounding: 3×3 4:2:0 is (27 + 1) / 2.
    EXPECT_EQ(14u, VCImage_requiredSize(3, 3, VC_FORMAT_YV12));
    EXPECT_EQ(2u, VCImage_requiredSize(1, 1, VC_FORMAT_NV12));
    EXPECT_EQ(0u, VCImage_requiredSize(0, 10, VC_FORMAT_RGBA));
    EXPECT_EQ(0u, VCImage_requiredSize(10, -1, VC_FORMAT_RGBA));
    EXPECT_EQ(0u, VCImage_requiredSize(10, 10, 0x12345678));
    EXPECT_EQ(0u, VCImage_requiredSize(10, 10, VC_FORMAT_JPEG));
    // Byte counts beyond 32 bits are no sizes, not wrapped values.
    EXPECT_EQ(0xFFFFFFFCu, VCImage_requiredSize(0x3FFFFFFF, 1, VC_FORMAT_RGBA));
    EXPECT_EQ(0u, VCImage_requiredSize(0x40000000, 1, VC_FORMAT_RGBA));
    EXPECT_EQ(0u, VCImage_requiredSize(46341, 46341, VC_FORMAT_NV21));  // 3·w·h > 2^32
    EXPECT_EQ(0u, VCImage_requiredSize(INT32_MAX, INT32_MAX, VC_FORMAT_GREY));

    EXPECT_EQ(0u, VCImage_size(nullptr));
    VCImage* image = VCImage_createEmpty(4, 4, VC_FORMAT_NV12);
    EXPECT_EQ(24u, VCImage_size(image));
    image->size = 100;  // the field wins when set
    EXPECT_EQ(100u, VCImage_size(image));
    VCImage_destroy(image);
}

TEST(VcImage, Families) {
    for (size_t i = 0; i < 13; ++i) {
        EXPECT_EQ(i < 6, VCImage_isRGB(kAll[i]) != 0) << i;
        EXPECT_EQ(i >= 6, VCImage_isYUV(kAll[i]) != 0) << i;
        EXPECT_EQ(i >= 9, VCImage_isYUV420(kAll[i]) != 0) << i;
    }
    EXPECT_FALSE(VCImage_isRGB(VC_FORMAT_JPEG) || VCImage_isYUV(VC_FORMAT_JPEG) ||
                 VCImage_isYUV420(VC_FORMAT_JPEG) || VCImage_isYUV(0));
    VCRgbLayout rgb;
    VCYuvLayout yuv;
    EXPECT_FALSE(VCImage_rgbLayout(VC_FORMAT_NV21, &rgb));
    EXPECT_FALSE(VCImage_yuvLayout(nullptr, &yuv));
    VCImage* rgba = VCImage_createEmpty(2, 2, VC_FORMAT_RGBA);
    EXPECT_FALSE(VCImage_yuvLayout(rgba, &yuv));
    VCImage_destroy(rgba);
}

TEST(VcImage, CreateAndWrapStates) {
    VCImage* fresh = VCImage_createNew(5, 3, VC_FORMAT_RGB8);
    ASSERT_NE(nullptr, fresh);
    EXPECT_EQ(45u, fresh->size);
    EXPECT_EQ(0, fresh->wrapped);
    memset(fresh->data, 0xAB, fresh->size);  // the whole buffer is ours (ASan checks)
    VCImage_destroy(fresh);
    EXPECT_EQ(nullptr, VCImage_createNew(0, 3, VC_FORMAT_RGBA));
    EXPECT_EQ(nullptr, VCImage_createNew(3, 3, 0));
    EXPECT_EQ(nullptr, VCImage_createNew(70000, 70000, VC_FORMAT_RGBA));

    // Null data: a header only, whatever size and offset were asked for.
    VCImage* header = VCImage_createWrap(nullptr, 640, 480, VC_FORMAT_NV21, 1000, 64);
    EXPECT_EQ(nullptr, header->data);
    EXPECT_EQ(0, header->wrapped);
    EXPECT_EQ(0u, header->size);
    EXPECT_EQ(0u, header->uvOffset);
    EXPECT_EQ(640, header->width);
    VCImage_destroy(header);

    std::vector<unsigned char> mine(64, 7);
    VCImage* wrap = VCImage_createWrap(mine.data(), 4, 4, VC_FORMAT_RGBA, -5, 12);
    EXPECT_EQ(1, wrap->wrapped);
    EXPECT_EQ(0u, wrap->size);  // negative sizes are not taken
    EXPECT_EQ(12u, wrap->uvOffset);
    VCImage_destroy(wrap);
    EXPECT_EQ(std::vector<unsigned char>(64, 7), mine);  // caller's memory untouched

    // Destroy runs the record's virtual destructor.
    gDestroyed = 0;
    VCImage* counting = new CountingImage;
    counting->width = counting->height = 2;
    counting->format = VC_FORMAT_RGBA;
    ASSERT_EQ(16, VCImage_allocate(counting));
    VCImage_destroy(counting);
    EXPECT_EQ(1, gDestroyed);
}

TEST(VcImage, AllocateWrapDeallocate) {
    LogCapture log;
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_allocate(nullptr));
    VCImage* unknown = VCImage_createEmpty(4, 4, 0x20202020);
    EXPECT_EQ(VC_ERROR_INVALID_PARAM, VCImage_allocate(unknown));
    VCImage_destroy(unknown);
    EXPECT_EQ(2u, log.lines().size());
    EXPECT_EQ(1, countErrors(log, "VC_ERROR_NULL_PARAM", -2));
    EXPECT_EQ(1, countErrors(log, "VC_ERROR_INVALID_PARAM", -3));

    VCImage* image = VCImage_createEmpty(3, 3, VC_FORMAT_NV21);
    EXPECT_EQ(nullptr, image->data);
    EXPECT_EQ(0, image->wrapped);
    EXPECT_EQ(0u, image->size);
    EXPECT_EQ(14, VCImage_allocate(image));
    EXPECT_EQ(14u, image->size);
    unsigned char* owned = image->data;
    EXPECT_EQ(14, VCImage_allocate(image));  // already has a buffer: nothing new
    EXPECT_EQ(owned, image->data);

    std::vector<unsigned char> mine(100, 1);
    // Wrapping frees the owned buffer first (ASan would report a leak otherwise).
    EXPECT_EQ(14, VCImage_wrap(image, mine.data(), 0, 0));
    EXPECT_EQ(0u, image->size);  // size 0 is stored as given
    EXPECT_EQ(1, image->wrapped);
    EXPECT_EQ(50, VCImage_wrap(image, mine.data(), 50, 20));
    EXPECT_EQ(20u, image->uvOffset);
    // Allocate on a wrapping image allocates nothing and returns the wrapped size.
    EXPECT_EQ(50, VCImage_allocate(image));
    EXPECT_EQ(mine.data(), image->data);
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_wrap(image, nullptr, 4, 0));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_wrap(nullptr, mine.data(), 4, 0));

    VCImage_deallocate(image);
    EXPECT_EQ(nullptr, image->data);
    EXPECT_EQ(0, image->wrapped);
    EXPECT_EQ(0u, image->size);
    EXPECT_EQ(0u, image->uvOffset);
    EXPECT_EQ(3, image->width);  // geometry stays
    EXPECT_EQ(std::vector<unsigned char>(100, 1), mine);

    EXPECT_EQ(14, VCImage_allocate(image));
    VCImage_reset(image);
    EXPECT_EQ(nullptr, image->data);
    EXPECT_EQ(0, image->width);
    EXPECT_EQ(0, image->height);
    EXPECT_EQ(0u, image->format);
    VCImage_reset(nullptr);
    VCImage_deallocate(nullptr);
    VCImage_destroy(image);
    VCImage_destroy(nullptr);
}

TEST(VcImage, CloneGathersDisplacedChroma) {
    const int w = 4, h = 2;
    // Luma, 6 bytes of padding, then chroma: as a camera buffer with a plane gap.
    std::vector<unsigned char> buffer(w * h + 6 + w * h / 2);
    for (size_t i = 0; i < buffer.size(); ++i) buffer[i] = static_cast<unsigned char>(i + 1);
    VCImage* src = VCImage_createWrap(buffer.data(), w, h, VC_FORMAT_NV21,
                                      static_cast<int>(buffer.size()), w * h + 6);
    VCImage* copy = VCImage_clone(src);
    ASSERT_NE(nullptr, copy);
    EXPECT_EQ(0, copy->wrapped);
    EXPECT_EQ(0u, copy->uvOffset);
    EXPECT_EQ(12u, copy->size);
    EXPECT_EQ(0, memcmp(copy->data, buffer.data(), w * h));
    EXPECT_EQ(0, memcmp(copy->data + w * h, buffer.data() + w * h + 6, w * h / 2));
    VCImage_destroy(copy);
    VCImage_destroy(src);

    // Odd sizes: (3·w·h + 1) / 2 bytes, chroma at w·h.
    std::vector<unsigned char> odd(9 + 3 + 4, 9);
    VCImage* oddSrc = VCImage_createWrap(odd.data(), 3, 3, VC_FORMAT_NV12, 0, 12);
    VCImage* oddCopy = VCImage_clone(oddSrc);
    ASSERT_NE(nullptr, oddCopy);
    EXPECT_EQ(14u, oddCopy->size);
    VCImage_destroy(oddCopy);
    VCImage_destroy(oddSrc);

    VCImage* rgb = VCImage_createNew(3, 2, VC_FORMAT_BGR8);
    for (uint32_t i = 0; i < rgb->size; ++i) rgb->data[i] = static_cast<unsigned char>(200 - i);
    VCImage* rgbCopy = VCImage_clone(rgb);
    ASSERT_NE(nullptr, rgbCopy);
    EXPECT_EQ(0, memcmp(rgb->data, rgbCopy->data, 18));
    VCImage* head = VCImage_cloneHeader(rgb);
    EXPECT_EQ(nullptr, head->data);
    EXPECT_EQ(3, head->width);
    EXPECT_EQ(2, head->height);
    EXPECT_EQ(VC_FORMAT_BGR8, head->format);
    for (VCImage* i : {head, rgbCopy, rgb}) VCImage_destroy(i);

    EXPECT_EQ(nullptr, VCImage_clone(nullptr));
    EXPECT_EQ(nullptr, VCImage_cloneHeader(nullptr));
    VCImage* bad = VCImage_createEmpty(0, 0, VC_FORMAT_RGBA);
    EXPECT_EQ(nullptr, VCImage_clone(bad));
    VCImage_destroy(bad);

    // A displaced chroma plane is read only inside a size field that is set;
    // without one the offset is trusted.
    std::vector<unsigned char> tight(8 + 6 + 4, 3);
    VCImage* cut = VCImage_createWrap(tight.data(), 4, 2, VC_FORMAT_NV21, 17, 14);
    EXPECT_EQ(nullptr, VCImage_clone(cut));
    cut->size = 0;
    VCImage* trusted = VCImage_clone(cut);
    ASSERT_NE(nullptr, trusted);
    EXPECT_EQ(std::vector<unsigned char>(12, 3),
              std::vector<unsigned char>(trusted->data, trusted->data + 12));
    for (VCImage* i : {cut, trusted}) VCImage_destroy(i);
}

TEST(VcImage, OversizedGeometries) {
    LogCapture log;
    // No 32-bit size at all: nothing to allocate, nothing to report from a wrap.
    VCImage* huge = VCImage_createEmpty(70000, 70000, VC_FORMAT_RGBA);
    EXPECT_EQ(VC_ERROR_INVALID_PARAM, VCImage_allocate(huge));
    EXPECT_EQ(nullptr, huge->data);
    unsigned char byte = 0;
    EXPECT_EQ(0, VCImage_wrap(huge, &byte, 0, 0));
    // A size that fits 32 bits but not the int result.
    VCImage* large = VCImage_createEmpty(30000, 30000, VC_FORMAT_RGBA);
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_allocate(large));
    EXPECT_EQ(nullptr, large->data);
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_wrap(large, &byte, 0, 0));
    EXPECT_EQ(VC_ERROR_INVALID_SIZE, VCImage_allocate(large));  // now wrapping, size unknown
    EXPECT_EQ(1, countErrors(log, "VC_ERROR_INVALID_PARAM", -3));
    EXPECT_EQ(3, countErrors(log, "VC_ERROR_INVALID_SIZE", -4));
    VCImage_destroy(huge);
    VCImage_destroy(large);
}

TEST(VcImage, LayoutDescriptors) {
    struct RgbRow {
        uint32_t format;
        VCRgbLayout want;
    } rgb[] = {
        {VC_FORMAT_RGBA, {4, 0, 1, 2, 3}},  {VC_FORMAT_BGRA, {4, 2, 1, 0, 3}},
        {VC_FORMAT_ARGB, {4, 1, 2, 3, 0}},  {VC_FORMAT_ABGR, {4, 3, 2, 1, 0}},
        {VC_FORMAT_RGB8, {3, 0, 1, 2, -1}}, {VC_FORMAT_BGR8, {3, 2, 1, 0, -1}},
    };
    for (const RgbRow& r : rgb) {
        VCRgbLayout l;
        ASSERT_TRUE(VCImage_rgbLayout(r.format, &l));
        EXPECT_EQ(std::vector<int>({r.want.bytesPerPixel, r.want.r, r.want.g, r.want.b, r.want.a}),
                  std::vector<int>({l.bytesPerPixel, l.r, l.g, l.b, l.a}))
            << std::string(reinterpret_cast<const char*>(&r.format), 4);
    }
    // An 8x4 image: luma end 32, a quarter plane 8; displaced chroma at 40.
    struct YuvRow {
        uint32_t format, uvOffset, u, v;
        int lumaStep, chromaStep;
    } yuv[] = {
        {VC_FORMAT_NV12, 0, 32, 33, 1, 2}, {VC_FORMAT_NV12, 40, 40, 41, 1, 2},
        {VC_FORMAT_NV21, 0, 33, 32, 1, 2}, {VC_FORMAT_NV21, 40, 41, 40, 1, 2},
        {VC_FORMAT_YV12, 0, 40, 32, 1, 1}, {VC_FORMAT_YV12, 40, 48, 40, 1, 1},
        {VC_FORMAT_YUVP, 0, 32, 40, 1, 1}, {VC_FORMAT_YUVP, 40, 40, 48, 1, 1},
        {VC_FORMAT_YUYV, 40, 1, 3, 2, 4},  {VC_FORMAT_YVYU, 0, 3, 1, 2, 4},
        {VC_FORMAT_GREY, 0, 0, 0, 1, 0},
    };
    for (const YuvRow& r : yuv) {
        VCImage image;
        image.width = 8;
        image.height = 4;
        image.format = r.format;
        image.uvOffset = r.uvOffset;
        VCYuvLayout l;
        ASSERT_TRUE(VCImage_yuvLayout(&image, &l));
        EXPECT_EQ(std::vector<int>(
                      {static_cast<int>(r.u), static_cast<int>(r.v), r.lumaStep, r.chromaStep}),
                  std::vector<int>({static_cast<int>(l.uOffset), static_cast<int>(l.vOffset),
                                    l.lumaStep, l.chromaStep}))
            << std::string(reinterpret_cast<const char*>(&r.format), 4) << " at " << r.uvOffset;
    }
}

TEST(VcImage, ErrorNamesAndLine) {
    const char* names[] = {
        "VC_ERROR_UNKNOWN",       "VC_ERROR_NULL_PARAM",   "VC_ERROR_INVALID_PARAM",
        "VC_ERROR_INVALID_SIZE",  "VC_ERROR_ALLOC_FAILED", "VC_ERROR_UNSUPPORTED",
        "VC_ERROR_INVALID_STATE", "VC_ERROR_IO_FAILED",    "VC_ERROR_CODEC_FAILED"};
    for (int i = 0; i < 9; ++i) EXPECT_STREQ(names[i], VCError_name(-1 - i));
    EXPECT_EQ(-42, VC_ERROR_NOT_IMPLEMENTED);
    LogCapture log;
    EXPECT_EQ(-42, VCError_report(-42, "core/egl/OpenGLManager", 321));
    EXPECT_EQ(-8, VCError_report(-8, "core/egl/OpenGLManager", 321));
    auto lines = log.lines();
    ASSERT_EQ(2u, lines.size());
    EXPECT_EQ("VC_ERROR_NOT_IMPLEMENTED (-42): core/egl/OpenGLManager:321", lines[0].text);
    EXPECT_EQ("VC_ERROR_IO_FAILED (-8): core/egl/OpenGLManager:321", lines[1].text);
    EXPECT_EQ(4, lines[0].level);
}
