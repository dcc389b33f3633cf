// Platform detection from the host properties (and the host property service
// itself), the texture-size cache and the graphic-buffer lock with its modes.
#include "core/egl/Platform.h"

#include <cutils/properties.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <ui/GraphicBuffer.h>

#include <string>

#include "core/egl/HalPixelFormat.h"
#include "support/gl_context.h"
#include "support/image_ptr.h"
#include "support/log_capture.h"

using android::GraphicBuffer;
using android::sp;

namespace {

const uint32_t kUsage = GraphicBuffer::USAGE_HW_TEXTURE | GraphicBuffer::USAGE_SW_READ_OFTEN |
                        GraphicBuffer::USAGE_SW_WRITE_OFTEN;

void setDevice(const char* board, const char* chip) {
    const char* names[2] = {"KIV_PROP_ro_board_platform", "KIV_PROP_ro_chipname"};
    const char* values[2] = {board, chip};
    for (int i = 0; i < 2; i++) {
        if (values[i] != nullptr) setenv(names[i], values[i], 1);
        if (values[i] == nullptr) unsetenv(names[i]);
    }
    Platform::resetForTesting();
}

class PlatformTest : public ::testing::Test {
protected:
    void SetUp() override { setDevice(nullptr, nullptr); }
    void TearDown() override { setDevice(nullptr, nullptr); }
};

// Board (any case) and chip decide the platform, the vendor, full-range NV21
// and the formats; the answers are cached.
TEST_F(PlatformTest, DevicesTable) {
    using namespace fourcc;
    const struct {
        const char *board, *chip;
        int platform, vendor;
        bool tavrixFull, qcomFull;
        uint32_t preferred;     // getPreferredInputFormat(true)
        bool nv21, nv12, bgra;  // native inputs
    } rows[] = {
        {"tavrix3", "tavrix3", 1, 1, false, false, NV12, false, true, true},
        {"tavrix4", "tavrix7420", 2, 1, true, false, NV12, false, true, true},
        {"TAVRIX5", "tavrix5410", 3, 1, false, false, NV12, true, true, true},
        {"tavrix5", "tavrix5433", 3, 1, true, false, NV21, true, true, true},
        {"msm8952", nullptr, 4, 0, false, false, NV21, true, false, false},
        {"msm8960", nullptr, 5, 2, false, true, NV21, true, false, false},
        {"MSM8974", "msm8974", 6, 2, false, true, NV21, true, false, false},
        {"msm8974", "APQ8064", 6, 2, false, false, NV21, true, false, false},
        {"msm8976", nullptr, 7, 0, false, false, NV21, true, false, false},
        {"msm8992", nullptr, 8, 2, false, true, NV21, true, false, false},
        {"msm8994", nullptr, 9, 2, false, true, NV21, true, false, false},
        {"apq8084", nullptr, 10, 2, false, true, NV21, true, false, false},
        {"msm8996", nullptr, 0, 0, false, false, NV21, false, false, false},
        {"tavrix", nullptr, 0, 0, false, false, NV21, false, false, false},
        {nullptr, nullptr, 0, 0, false, false, NV21, false, false, false},
    };
    for (const auto& r : rows) {
        setDevice(r.board, r.chip);
        SCOPED_TRACE(std::string(r.board ? r.board : "none") + " " + (r.chip ? r.chip : ""));
        EXPECT_EQ(r.platform, Platform::getCurrentPlatform());
        EXPECT_EQ(r.vendor, Platform::getCurrentVendor());
        EXPECT_EQ(r.tavrixFull, Platform::isSupported_TAVRIX_NV21_FULL_RANGE());
        EXPECT_EQ(r.qcomFull, Platform::isSupported_QCOM_NV21_FULL_RANGE());
        EXPECT_EQ(VCImageTest_fourcc(r.preferred),
                  VCImageTest_fourcc(Platform::getPreferredInputFormat(true)));
        EXPECT_EQ(VC_FORMAT_RGBA, Platform::getPreferredInputFormat(false));
        EXPECT_EQ(std::vector<bool>({r.nv21, r.nv12, r.bgra, true}),
                  std::vector<bool>(
                      {Platform::isNativeInputFormat(NV21), Platform::isNativeInputFormat(NV12),
                       Platform::isNativeInputFormat(BGRA), Platform::isNativeInputFormat(RGBA)}));
        EXPECT_TRUE(Platform::isNativeOutputFormat(RGBA) && !Platform::isNativeOutputFormat(BGRA));
    }
    // The answers are cached: a property changed afterwards is not seen.
    setDevice("MSM8974", nullptr);
    Platform::getCurrentPlatform();
    Platform::isSupported_QCOM_NV21_FULL_RANGE();
    setenv("KIV_PROP_ro_board_platform", "tavrix3", 1);
    EXPECT_EQ(Platform::PLATFORM_MSM8974, Platform::getCurrentPlatform());
    EXPECT_EQ(Platform::VENDOR_QCOM, Platform::getCurrentVendor());
    EXPECT_TRUE(Platform::isSupported_QCOM_NV21_FULL_RANGE());
}

TEST_F(PlatformTest, MaximumTextureSizeIsQueriedOnceWithAFallback) {
    // No context: the query yields nothing and the fallback is kept.
    ASSERT_EQ(eglGetCurrentContext(), EGL_NO_CONTEXT);
    EXPECT_EQ(Platform::getMaximumTextureSize(), 4096);
    GlContext gl;
    ASSERT_TRUE(gl.ok());
    GLint real = 0;
    glGetIntegerv(GL_MAX_TEXTURE_SIZE, &real);
    ASSERT_TRUE(real > 0 && real != 4096);  // llvmpipe's limit is larger: the cases differ
    EXPECT_EQ(Platform::getMaximumTextureSize(), 4096);  // cached
    Platform::resetForTesting();
    EXPECT_EQ(Platform::getMaximumTextureSize(), real);
    gl.release();
    EXPECT_EQ(Platform::getMaximumTextureSize(), real);  // no context needed any more
}

// A compact copy of padded rows (luma rows only for 4:2:0), the memory
// wrapped in place by both wrapping modes, an empty record for other modes,
// and the buffer left locked for the caller; implementation-defined buffers
// take the format asked; on tavrix5 semi-planar buffers are locked plane by
// plane; a locked buffer or an unknown format gives nothing.
TEST_F(PlatformTest, LockGraphicBuffer) {
    sp<GraphicBuffer> rgba = new GraphicBuffer(6, 3, HAL_PIXEL_FORMAT_RGBA_8888, kUsage, 8u, "t");
    sp<GraphicBuffer> nv21 =
        new GraphicBuffer(4, 4, HAL_PIXEL_FORMAT_YCrCb_420_SP, kUsage, 6u, "t");
    sp<GraphicBuffer> opaque =
        new GraphicBuffer(4, 4, HAL_PIXEL_FORMAT_IMPLEMENTATION_DEFINED, kUsage);
    sp<GraphicBuffer> nv12 = new GraphicBuffer(8, 4, HAL_PIXEL_FORMAT_VENDOR_YCbCr_420_SP, kUsage);
    uint8_t* memory[2] = {};
    for (int b = 0; b < 2; ++b) {
        void* address = nullptr;
        ASSERT_EQ((b ? nv21 : rgba)->lock(GraphicBuffer::USAGE_SW_WRITE_OFTEN, &address), 0);
        memory[b] = static_cast<uint8_t*>(address);
        for (int i = 0; i < (b ? 6 * 6 : 8 * 3 * 4); ++i)
            memory[b][i] = i + 1;  // NV21 6x4 rows + chroma
        (b ? nv21 : rgba)->unlock();
    }
    EXPECT_EQ(Platform::lockGraphicBuffer(nullptr, 0, 0), nullptr);
    const struct {
        sp<GraphicBuffer> buffer;
        int mode, extra, device;
        const uint8_t* data;  // null: a compact copy of `rows` rows of `row` bytes
        int rows, row, stride;
        const char* record;
    } cases[] = {
        {rgba, Platform::LOCK_COMPACT, 34, 0, nullptr, 3, 24, 32,
         "6x3 RGBA wrapped 0 size 72 uv 0"},
        {rgba, Platform::LOCK_WRAP, 0, 0, memory[0], 0, 0, 0, "6x3 RGBA wrapped 1 size 72 uv 0"},
        {rgba, Platform::LOCK_WRAP_2, 0, 0, memory[0], 0, 0, 0, "6x3 RGBA wrapped 1 size 72 uv 0"},
        {rgba, 7, 0, 0, nullptr, 0, 0, 0, "6x3 RGBA no data wrapped 0 size 72 uv 0"},
        {nv21, Platform::LOCK_COMPACT, 0, 0, nullptr, 4, 4, 6, "4x4 NV21 wrapped 0 size 24 uv 0"},
        {opaque, Platform::LOCK_WRAP, 17, 0, nullptr, 0, 0, 0, "4x4 NV21 wrapped 1 size 24 uv 0"},
        {nv12, Platform::LOCK_COMPACT, 0, 1, nullptr, 0, 0, 0, "8x4 NV12 wrapped 1 size 48 uv 32"},
    };
    for (const auto& c : cases) {
        setDevice(c.device ? "tavrix5" : nullptr, nullptr);
        LogCapture log;
        ImagePtr image(Platform::lockGraphicBuffer(c.buffer, c.mode, c.extra));
        ASSERT_NE(image, nullptr) << c.record;
        EXPECT_EQ(c.record, VCImageTest_record(image.get()));
        EXPECT_TRUE(c.data == nullptr || c.data == image->data);
        for (int y = 0; y < c.rows; ++y)
            EXPECT_EQ(
                0, memcmp(image->data + y * c.row, memory[c.buffer == nv21] + y * c.stride, c.row));
        void* again = nullptr;  // still locked until given back
        EXPECT_EQ(android::INVALID_OPERATION,
                  c.buffer->lock(GraphicBuffer::USAGE_SW_READ_OFTEN, &again));
        EXPECT_EQ(nullptr, Platform::lockGraphicBuffer(c.buffer, Platform::LOCK_WRAP, 0));
        image.reset();
        EXPECT_EQ(c.buffer->unlock(), android::NO_ERROR);
    }
    setDevice(nullptr, nullptr);
    LogCapture log;
    ImagePtr(Platform::lockGraphicBuffer(rgba, Platform::LOCK_COMPACT, 0));
    rgba->unlock();
    sp<GraphicBuffer> bgra = new GraphicBuffer(4, 4, HAL_PIXEL_FORMAT_BGRA_8888, kUsage);
    EXPECT_EQ(Platform::lockGraphicBuffer(bgra, 0, 0), nullptr);
    EXPECT_TRUE(log.matches({"E EGL: lockGraphicBuffer format : 1, width : 6, stride : 8",
                             "E lockGraphicBuffer: Unsupported pixel format 0x5"}));
    // The table between the library's formats and the buffers': the host-only
    // layouts are never asked for.
    using namespace fourcc;
    const std::pair<uint32_t, int> table[] = {{RGBA, HAL_PIXEL_FORMAT_RGBA_8888},
                                              {NV21, HAL_PIXEL_FORMAT_YCrCb_420_SP},
                                              {NV12, HAL_PIXEL_FORMAT_VENDOR_YCbCr_420_SP},
                                              {YV12, HAL_PIXEL_FORMAT_YV12},
                                              {BGRA, 0},
                                              {GREY, 0}};
    for (const auto& t : table) EXPECT_EQ(t.second, HalPixelFormat::codeOf(t.first)) << t.first;
    EXPECT_EQ(NV21, HalPixelFormat::fourccOf(HAL_PIXEL_FORMAT_VENDOR_YCrCb_420_SP, true));
    EXPECT_EQ(0u, HalPixelFormat::fourccOf(HAL_PIXEL_FORMAT_BGRA_8888, true));
    EXPECT_EQ(BGRA, HalPixelFormat::fourccOf(HAL_PIXEL_FORMAT_BGRA_8888, false));
}

TEST(PropertiesTest, MappedVariablesDefaultsAndLimits) {
    char value[PROPERTY_VALUE_MAX];
    setenv("KIV_PROP_ro_chipname", "", 1);  // empty reads as unset
    setenv("KIV_PROP_test_long", std::string(200, 'a').c_str(), 1);
    setenv("KIV_PROP_ro_board_platform", "msm8974", 1);
    const struct {
        const char* key;
        const char* fallback;
        int length;
        std::string value;
    } rows[] = {
        {"ro.board.platform", "fallback", 7, "msm8974"},
        {"ro_board_platform", "x", 7, "msm8974"},  // dots become underscores
        {"ro.board.platforms", "x", 1, "x"},
        {"ro.chipname", "dflt", 4, "dflt"},
        {"ro.chipname", nullptr, 0, ""},
        {"test.long", "", PROPERTY_VALUE_MAX - 1, std::string(PROPERTY_VALUE_MAX - 1, 'a')},
        {nullptr, "d", 1, "d"},
        {"a.b", "d", 1, "d"},
    };
    for (const auto& r : rows) {
        EXPECT_EQ(r.length, property_get(r.key, value, r.fallback)) << (r.key ? r.key : "null");
        EXPECT_EQ(r.value, std::string(value));
    }
    EXPECT_EQ(property_get("a.b", nullptr, "d"), 0);
    EXPECT_EQ(property_get(std::string(500, 'k').c_str(), value, "d"), 1);
    for (const char* name :
         {"KIV_PROP_ro_chipname", "KIV_PROP_test_long", "KIV_PROP_ro_board_platform"})
        unsetenv(name);
}

}  // namespace
