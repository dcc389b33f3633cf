// Platform detection from the host properties (and the host property
// service itself), the texture-size cache and the graphic-buffer lock with
// its modes.
#include "core/egl/Platform.h"

#include <cutils/properties.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <ui/GraphicBuffer.h>

#include <string>

#include "core/egl/HalPixelFormat.h"
#include "support/gl_context.h"
#include "support/log_capture.h"
#include "vccore/vc_log.h"

using android::GraphicBuffer;
using android::sp;

namespace {

// Writes i + 1 into the first n bytes of the buffer's memory, which it returns unlocked.
uint8_t* fill(const sp<GraphicBuffer>& buffer, int n) {
    void* address = nullptr;
    EXPECT_EQ(buffer->lock(GraphicBuffer::USAGE_SW_WRITE_OFTEN, &address), android::NO_ERROR);
    uint8_t* memory = static_cast<uint8_t*>(address);
    for (int i = 0; i < n; ++i) memory[i] = (uint8_t)(i + 1);
    buffer->unlock();
    return memory;
}

const uint32_t kUsage = GraphicBuffer::USAGE_HW_TEXTURE | GraphicBuffer::USAGE_SW_READ_OFTEN |
                        GraphicBuffer::USAGE_SW_WRITE_OFTEN;

class PlatformTest : public ::testing::Test {
protected:
    void SetUp() override { setDevice(nullptr, nullptr); }
    void TearDown() override { setDevice(nullptr, nullptr); }

    static void setDevice(const char* board, const char* chip) {
        const char* names[2] = {"KIV_PROP_ro_board_platform", "KIV_PROP_ro_chipname"};
        const char* values[2] = {board, chip};
        for (int i = 0; i < 2; i++) {
            if (values[i] != nullptr) setenv(names[i], values[i], 1);
            if (values[i] == nullptr) unsetenv(names[i]);
        }
        Platform::resetForTesting();
    }
};

TEST_F(PlatformTest, BoardTableIgnoresCaseAndLogsOnce) {
    const struct {
        const char* board;
        int platform;
        int vendor;
    } cases[] = {
        {"tavrix3", 1, 1}, {"tavrix4", 2, 1},  {"TAVRIX5", 3, 1}, {"msm8952", 4, 0},
        {"msm8960", 5, 2}, {"MSM8974", 6, 2},  {"msm8976", 7, 0}, {"msm8992", 8, 2},
        {"msm8994", 9, 2}, {"apq8084", 10, 2}, {"msm8996", 0, 0}, {"tavrix", 0, 0},
    };
    for (const auto& c : cases) {
        setDevice(c.board, nullptr);
        EXPECT_EQ(Platform::getCurrentPlatform(), c.platform) << c.board;
        EXPECT_EQ(Platform::getCurrentVendor(), c.vendor) << c.board;
    }

    setDevice("MSM8974", nullptr);
    LogCapture log;
    Platform::getCurrentPlatform();
    Platform::getCurrentVendor();
    EXPECT_TRUE(log.contains("Current platform is MSM8974 (known)"));
    EXPECT_TRUE(log.contains("Current vendor is QCOM"));
    // Cached: a changed property is not seen, and nothing is logged again.
    setenv("KIV_PROP_ro_board_platform", "tavrix3", 1);
    log.clear();
    EXPECT_EQ(Platform::getCurrentPlatform(), Platform::PLATFORM_MSM8974);
    EXPECT_EQ(Platform::getCurrentVendor(), Platform::VENDOR_QCOM);
    EXPECT_TRUE(log.lines().empty());

    setDevice("sdm845", nullptr);
    log.clear();
    EXPECT_EQ(Platform::getCurrentPlatform(), Platform::PLATFORM_UNKNOWN);
    EXPECT_EQ(Platform::getCurrentVendor(), Platform::VENDOR_UNKNOWN);
    EXPECT_TRUE(log.contains("Current platform is sdm845 (unknown)"));
    EXPECT_TRUE(log.contains("Current vendor is UNKNOWN"));
    setDevice("tavrix4", nullptr);
    log.clear();
    Platform::getCurrentVendor();
    EXPECT_TRUE(log.contains("Current vendor is KVAR"));
}

TEST_F(PlatformTest, FullRangeAndFormatsPerDevice) {
    LogCapture log;
    setDevice("msm8976", nullptr);  // known board, unknown vendor
    EXPECT_FALSE(Platform::isSupported_TAVRIX_NV21_FULL_RANGE());
    EXPECT_FALSE(Platform::isSupported_QCOM_NV21_FULL_RANGE());
    EXPECT_TRUE(log.contains("isSupported_TAVRIX_NV21_FULL_RANGE false"));
    EXPECT_TRUE(log.contains("isSupported_QCOM_NV21_FULL_RANGE false"));
    EXPECT_EQ(Platform::getPreferredInputFormat(true), VC_FORMAT_NV21);
    EXPECT_TRUE(Platform::isNativeInputFormat(VC_FORMAT_NV21));
    EXPECT_TRUE(Platform::isNativeInputFormat(VC_FORMAT_RGBA));
    EXPECT_FALSE(Platform::isNativeInputFormat(VC_FORMAT_NV12));

    setDevice("msm8974", "msm8974");
    EXPECT_TRUE(Platform::isSupported_QCOM_NV21_FULL_RANGE());
    setDevice("msm8974", "APQ8064");
    EXPECT_FALSE(Platform::isSupported_QCOM_NV21_FULL_RANGE());
    EXPECT_FALSE(Platform::isSupported_TAVRIX_NV21_FULL_RANGE());

    setDevice("tavrix5", "tavrix5410");
    EXPECT_FALSE(Platform::isSupported_TAVRIX_NV21_FULL_RANGE());
    EXPECT_EQ(Platform::getPreferredInputFormat(true), VC_FORMAT_NV12);
    EXPECT_TRUE(Platform::isNativeInputFormat(VC_FORMAT_NV21));
    EXPECT_TRUE(Platform::isNativeInputFormat(VC_FORMAT_BGRA));
    setDevice("tavrix5", "tavrix5433");
    log.clear();
    EXPECT_TRUE(Platform::isSupported_TAVRIX_NV21_FULL_RANGE());
    EXPECT_TRUE(log.contains("isSupported_TAVRIX_NV21_FULL_RANGE true"));
    EXPECT_EQ(Platform::getPreferredInputFormat(true), VC_FORMAT_NV21);
    setDevice("tavrix3", "tavrix3");
    EXPECT_FALSE(Platform::isSupported_TAVRIX_NV21_FULL_RANGE());
    setDevice("tavrix4", "tavrix7420");
    EXPECT_TRUE(Platform::isSupported_TAVRIX_NV21_FULL_RANGE());
    EXPECT_EQ(Platform::getPreferredInputFormat(true), VC_FORMAT_NV12);  // whatever the range
    EXPECT_FALSE(Platform::isNativeInputFormat(VC_FORMAT_NV21));
    EXPECT_TRUE(Platform::isNativeInputFormat(VC_FORMAT_NV12));
    EXPECT_EQ(Platform::getPreferredInputFormat(false), VC_FORMAT_RGBA);

    setDevice(nullptr, nullptr);  // no property at all
    EXPECT_EQ(Platform::getCurrentPlatform(), Platform::PLATFORM_UNKNOWN);
    EXPECT_TRUE(Platform::isNativeInputFormat(VC_FORMAT_RGBA));
    EXPECT_FALSE(Platform::isNativeInputFormat(VC_FORMAT_NV21));
    EXPECT_FALSE(Platform::isNativeInputFormat(VC_FORMAT_BGRA));
    EXPECT_EQ(Platform::getPreferredInputFormat(true), VC_FORMAT_NV21);
    EXPECT_TRUE(Platform::isNativeOutputFormat(VC_FORMAT_RGBA));
    EXPECT_FALSE(Platform::isNativeOutputFormat(VC_FORMAT_BGRA));
}

TEST_F(PlatformTest, MaximumTextureSizeIsQueriedOnceWithAFallback) {
    // No context: the query yields nothing and the fallback is kept.
    ASSERT_EQ(eglGetCurrentContext(), EGL_NO_CONTEXT);
    EXPECT_EQ(Platform::getMaximumTextureSize(), 4096);
    GlContext gl;
    ASSERT_TRUE(gl.ok());
    GLint real = 0;
    glGetIntegerv(GL_MAX_TEXTURE_SIZE, &real);
    ASSERT_GT(real, 0);
    ASSERT_NE(real, 4096);  // llvmpipe's limit is larger, so the two cases differ
    EXPECT_EQ(Platform::getMaximumTextureSize(), 4096);  // cached
    Platform::resetForTesting();
    EXPECT_EQ(Platform::getMaximumTextureSize(), real);
    gl.release();
    EXPECT_EQ(Platform::getMaximumTextureSize(), real);  // no context needed any more
}

TEST_F(PlatformTest, LockCompactsPaddedRowsWrapsOrLeavesEmpty) {
    const int w = 6;
    const int h = 3;
    sp<GraphicBuffer> buffer = new GraphicBuffer(w, h, HAL_PIXEL_FORMAT_RGBA_8888, kUsage, 8u, "t");
    uint8_t* memory = fill(buffer, 8 * h * 4);

    EXPECT_EQ(Platform::lockGraphicBuffer(nullptr, 0, 0), nullptr);
    LogCapture log;
    VCImage* image = Platform::lockGraphicBuffer(buffer, Platform::LOCK_COMPACT, 34);
    ASSERT_NE(image, nullptr);
    EXPECT_TRUE(
        log.contains(VF_LOG_ERROR, "EGL: lockGraphicBuffer format : 1, width : 6, stride : 8"));
    EXPECT_EQ(image->format, VC_FORMAT_RGBA);
    EXPECT_EQ(image->width, w);
    EXPECT_EQ(image->wrapped, 0);  // its own compact copy
    EXPECT_NE(image->data, memory);
    EXPECT_EQ(image->size, (uint32_t)(w * h * 4));
    for (int y = 0; y < h; ++y) {
        EXPECT_EQ(0, memcmp(image->data + y * w * 4, memory + y * 8 * 4, w * 4)) << "row " << y;
    }
    VCImage_destroy(image);
    EXPECT_EQ(buffer->unlock(), android::NO_ERROR);  // left locked for the caller

    // Both wrapping modes wrap in place, padded rows and all; any other mode
    // leaves the record empty.
    const uint8_t* wants[3] = {memory, memory, nullptr};
    const int modes[3] = {Platform::LOCK_WRAP, Platform::LOCK_WRAP_2, 7};
    for (int i = 0; i < 3; i++) {
        image = Platform::lockGraphicBuffer(buffer, modes[i], 0);
        ASSERT_NE(image, nullptr);
        EXPECT_EQ(image->data, wants[i]) << "mode " << modes[i];
        EXPECT_EQ(image->wrapped, i < 2 ? 1 : 0) << "mode " << modes[i];
        VCImage_destroy(image);
        buffer->unlock();
    }

    // Already locked: the lock fails and nothing is returned.
    void* address = nullptr;
    ASSERT_EQ(buffer->lock(GraphicBuffer::USAGE_SW_READ_OFTEN, &address), android::NO_ERROR);
    EXPECT_EQ(Platform::lockGraphicBuffer(buffer, Platform::LOCK_WRAP, 0), nullptr);
    buffer->unlock();

    sp<GraphicBuffer> bgra = new GraphicBuffer(4, 4, HAL_PIXEL_FORMAT_BGRA_8888, kUsage);
    log.clear();
    EXPECT_EQ(Platform::lockGraphicBuffer(bgra, 0, 0), nullptr);
    EXPECT_TRUE(log.contains(VF_LOG_ERROR, "lockGraphicBuffer: Unsupported pixel format 0x5"));
}

// Each format the library allocates a buffer in locks back as that format;
// the host-only layouts are never asked for.
TEST_F(PlatformTest, LibraryFormatsLockBackAsThemselves) {
    const uint32_t formats[] = {VC_FORMAT_RGBA, VC_FORMAT_NV21, VC_FORMAT_NV12, VC_FORMAT_YV12};
    const int codes[] = {HAL_PIXEL_FORMAT_RGBA_8888, HAL_PIXEL_FORMAT_YCrCb_420_SP,
                         HAL_PIXEL_FORMAT_VENDOR_YCbCr_420_SP, HAL_PIXEL_FORMAT_YV12};
    for (int i = 0; i < 4; ++i) {
        ASSERT_EQ(HalPixelFormat::codeOf(formats[i]), codes[i]) << i;
        sp<GraphicBuffer> buffer = new GraphicBuffer(8, 4, codes[i], kUsage);
        VCImage* image = Platform::lockGraphicBuffer(buffer, Platform::LOCK_WRAP, 0);
        ASSERT_NE(image, nullptr) << i;
        EXPECT_EQ(image->format, formats[i]) << i;
        VCImage_destroy(image);
        EXPECT_EQ(buffer->unlock(), android::NO_ERROR);
    }
    EXPECT_EQ(HalPixelFormat::fourccOf(HAL_PIXEL_FORMAT_VENDOR_YCrCb_420_SP, true), VC_FORMAT_NV21);
    for (uint32_t other : {VC_FORMAT_BGRA, VC_FORMAT_GREY})
        EXPECT_EQ(HalPixelFormat::codeOf(other), 0);
    EXPECT_EQ(HalPixelFormat::fourccOf(HAL_PIXEL_FORMAT_BGRA_8888, true), 0u);
    EXPECT_EQ(HalPixelFormat::fourccOf(HAL_PIXEL_FORMAT_BGRA_8888, false), VC_FORMAT_BGRA);
}

TEST_F(PlatformTest, LockOfYuvBuffers) {
    // Implementation-defined buffers take the format argument.
    sp<GraphicBuffer> opaque =
        new GraphicBuffer(4, 4, HAL_PIXEL_FORMAT_IMPLEMENTATION_DEFINED, kUsage);
    VCImage* image = Platform::lockGraphicBuffer(opaque, Platform::LOCK_WRAP, 17);
    ASSERT_NE(image, nullptr);
    EXPECT_EQ(image->format, VC_FORMAT_NV21);
    VCImage_destroy(image);
    opaque->unlock();

    // 4:2:0 with padded rows: only the luma rows are compacted.
    sp<GraphicBuffer> padded =
        new GraphicBuffer(4, 4, HAL_PIXEL_FORMAT_YCrCb_420_SP, kUsage, 6u, "t");
    uint8_t* memory = fill(padded, 6 * 6);
    image = Platform::lockGraphicBuffer(padded, Platform::LOCK_COMPACT, 0);
    ASSERT_NE(image, nullptr);
    EXPECT_EQ(image->size, 24u);
    for (int y = 0; y < 4; ++y) {
        EXPECT_EQ(0, memcmp(image->data + y * 4, memory + y * 6, 4)) << "row " << y;
    }
    VCImage_destroy(image);
    padded->unlock();

    // On tavrix3 and tavrix5 semi-planar buffers are locked plane by plane.
    setDevice("tavrix5", nullptr);
    sp<GraphicBuffer> nv12 = new GraphicBuffer(8, 4, HAL_PIXEL_FORMAT_VENDOR_YCbCr_420_SP, kUsage);
    image = Platform::lockGraphicBuffer(nv12, Platform::LOCK_COMPACT, 0);
    ASSERT_NE(image, nullptr);
    EXPECT_EQ(image->format, VC_FORMAT_NV12);
    EXPECT_EQ(image->wrapped, 1);
    EXPECT_EQ(image->uvOffset, 32u);
    EXPECT_EQ(image->size, 48u);
    android_ycbcr ycbcr;
    EXPECT_EQ(nv12->lockYCbCr(GraphicBuffer::USAGE_SW_READ_OFTEN, &ycbcr),
              android::INVALID_OPERATION);  // still locked
    VCImage_destroy(image);
    EXPECT_EQ(nv12->unlock(), android::NO_ERROR);
    ASSERT_EQ(nv12->lockYCbCr(GraphicBuffer::USAGE_SW_READ_OFTEN, &ycbcr), android::NO_ERROR);
    nv12->unlock();
}

TEST(PropertiesTest, ReadsTheMappedVariableOrTheDefault) {
    char value[PROPERTY_VALUE_MAX];
    unsetenv("KIV_PROP_ro_board_platform");
    EXPECT_EQ(property_get("ro.board.platform", value, ""), 0);
    EXPECT_STREQ(value, "");
    EXPECT_EQ(property_get("ro.board.platform", value, nullptr), 0);
    EXPECT_STREQ(value, "");
    EXPECT_EQ(property_get("ro.board.platform", value, "fallback"), 8);
    EXPECT_STREQ(value, "fallback");

    setenv("KIV_PROP_ro_board_platform", "msm8974", 1);
    EXPECT_EQ(property_get("ro.board.platform", value, "fallback"), 7);
    EXPECT_STREQ(value, "msm8974");
    // Dots become underscores, so this spelling names the same variable.
    EXPECT_EQ(property_get("ro_board_platform", value, "x"), 7);
    EXPECT_EQ(property_get("ro.board.platforms", value, "x"), 1);
    EXPECT_STREQ(value, "x");
    unsetenv("KIV_PROP_ro_board_platform");

    setenv("KIV_PROP_ro_chipname", "", 1);  // empty reads as unset
    EXPECT_EQ(property_get("ro.chipname", value, "dflt"), 4);
    EXPECT_STREQ(value, "dflt");
    unsetenv("KIV_PROP_ro_chipname");
}

TEST(PropertiesTest, LongValuesAreCutAndBadArgumentsAreSafe) {
    char value[PROPERTY_VALUE_MAX];
    setenv("KIV_PROP_test_long", std::string(200, 'a').c_str(), 1);
    EXPECT_EQ(property_get("test.long", value, ""), PROPERTY_VALUE_MAX - 1);
    EXPECT_EQ(std::string(value), std::string(PROPERTY_VALUE_MAX - 1, 'a'));
    unsetenv("KIV_PROP_test_long");

    EXPECT_EQ(property_get(nullptr, value, "d"), 1);
    EXPECT_STREQ(value, "d");
    EXPECT_EQ(property_get("a.b", nullptr, "d"), 0);
    EXPECT_EQ(property_get(std::string(500, 'k').c_str(), value, "d"), 1);
}

}  // namespace
