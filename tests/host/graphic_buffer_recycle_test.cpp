// Host GraphicBuffers that went away after GPU use are recycled: a new buffer
// of the same layout and kind takes the old memory and mirror. A render target
// still reads as a new one (zeros on the CPU, what zeros convert to on the
// GPU); a texture-only buffer's mirror matches the bytes it came with. What is
// kept goes with the display's last other user.
#include <ui/GraphicBuffer.h>

#include <gtest/gtest.h>

#include <vector>

#include "core/egl/EglEnvironment.h"
#include "core/egl/HalPixelFormat.h"
#include "graphic_buffer_usage.h"
#include "host/ui/GraphicBufferTestSeam.h"
#include "support/gl_context.h"
#include "support/open_files.h"

using android::GraphicBuffer;
using android::sp;
using Seam = android::GraphicBufferTestSeam;

namespace {

size_t bytesOf(int w, int h, int format) {
    return format == HAL_PIXEL_FORMAT_RGBA_8888 ? size_t(w) * h * 4 : size_t(w) * h * 3 / 2;
}

// A buffer that held a picture on both sides, then went away; returns where
// its CPU pixels were.
const void* useAndDrop(EGLDisplay display, int w, int h, int format,
                       uint32_t usage = kRenderUsage) {
    sp<GraphicBuffer> buffer = new GraphicBuffer(w, h, format, usage);
    const void* pixels = fillCpu(buffer, 0x5A, bytesOf(w, h, format));
    EXPECT_NE(pixels, nullptr);
    EXPECT_FALSE(GlTest_bufferPixels(display, buffer).empty());
    return pixels;
}

class GraphicBufferRecycleTest : public GlContextTest {
protected:
    EGLDisplay display() { return mGl->env()->getEGLDisplay(); }
};

TEST_F(GraphicBufferRecycleTest, RecycledBuffersReadAsNewOnBothSides) {
    const int w = 8, h = 6;
    // Zeros as the GPU sees them: RGBA as is; NV21 Y=U=V=0 in full range is
    // R = 0 + 1.402 * -128 -> 0, G = 0.34414 * 128 + 0.71414 * 128 -> 135,
    // B = 1.772 * -128 -> 0, opaque.
    const struct {
        int format;
        uint8_t zero[4];
    } cases[] = {{HAL_PIXEL_FORMAT_RGBA_8888, {0, 0, 0, 0}},
                 {HAL_PIXEL_FORMAT_YCrCb_420_SP, {0, 135, 0, 255}}};
    for (const auto& c : cases) {
        const void* old = useAndDrop(display(), w, h, c.format);
        sp<GraphicBuffer> buffer = new GraphicBuffer(w, h, c.format, kRenderUsage);
        const void* pixels = nullptr;
        const size_t bytes = bytesOf(w, h, c.format);
        EXPECT_EQ(cpuBytes(buffer, bytes, &pixels), std::vector<uint8_t>(bytes, 0)) << c.format;
        EXPECT_EQ(pixels, old) << c.format;  // the memory was recycled...
        std::vector<uint8_t> expected;
        for (int i = 0; i < w * h; ++i) expected.insert(expected.end(), c.zero, c.zero + 4);
        EXPECT_EQ(GlTest_bufferPixels(display(), buffer), expected)
            << c.format;  // ...and its mirror
    }
    // GPU side first: a render target's first lock reads the zeroed mirror
    // back; a texture-only buffer's memory is not handed to it.
    useAndDrop(display(), w, h, HAL_PIXEL_FORMAT_RGBA_8888);
    useAndDrop(display(), w, h, HAL_PIXEL_FORMAT_RGBA_8888, kTextureUsage);
    sp<GraphicBuffer> target = new GraphicBuffer(w, h, HAL_PIXEL_FORMAT_RGBA_8888, kRenderUsage);
    EXPECT_EQ(GlTest_bufferPixels(display(), target), std::vector<uint8_t>(w * h * 4, 0));
    EXPECT_EQ(cpuBytes(target, w * h * 4), std::vector<uint8_t>(w * h * 4, 0));

    // The texture-only memory goes to a texture-only buffer, mirror and all.
    sp<GraphicBuffer> source = new GraphicBuffer(w, h, HAL_PIXEL_FORMAT_RGBA_8888, kTextureUsage);
    EXPECT_EQ(cpuBytes(source, w * h * 4), std::vector<uint8_t>(w * h * 4, 0x5A));
    EXPECT_EQ(GlTest_bufferPixels(display(), source), std::vector<uint8_t>(w * h * 4, 0x5A));

    // Written before its first GPU use, a recycled texture shows the new bytes.
    source.clear();
    sp<GraphicBuffer> written = new GraphicBuffer(w, h, HAL_PIXEL_FORMAT_RGBA_8888, kTextureUsage);
    ASSERT_NE(nullptr, fillCpu(written, 0x33, w * h * 4));
    EXPECT_EQ(GlTest_bufferPixels(display(), written), std::vector<uint8_t>(w * h * 4, 0x33));
}

// Shared storage (rows as long as the driver's) is recycled with its texture:
// clean for a render target on both sides at once, as it was for a texture.
TEST_F(GraphicBufferRecycleTest, SharedStorageRecyclesWithTheSameRules) {
    const int w = 16, h = 4;
    const size_t bytes = w * h * 4;
    const void* old = useAndDrop(display(), w, h, HAL_PIXEL_FORMAT_RGBA_8888);
    sp<GraphicBuffer> target = new GraphicBuffer(w, h, HAL_PIXEL_FORMAT_RGBA_8888, kRenderUsage);
    EXPECT_EQ(GlTest_bufferPixels(display(), target), std::vector<uint8_t>(bytes, 0));
    EXPECT_TRUE(Seam::sharesGpuStorage(target));
    const void* pixels = nullptr;
    EXPECT_EQ(cpuBytes(target, bytes, &pixels), std::vector<uint8_t>(bytes, 0));
    EXPECT_EQ(pixels, old);

    useAndDrop(display(), w, h, HAL_PIXEL_FORMAT_RGBA_8888, kTextureUsage);
    sp<GraphicBuffer> source = new GraphicBuffer(w, h, HAL_PIXEL_FORMAT_RGBA_8888, kTextureUsage);
    EXPECT_EQ(GlTest_bufferPixels(display(), source), std::vector<uint8_t>(bytes, 0x5A));
    ASSERT_NE(nullptr, fillCpu(source, 0x33, bytes));
    EXPECT_EQ(GlTest_bufferPixels(display(), source), std::vector<uint8_t>(bytes, 0x33));
}

TEST(GraphicBufferRecycleDisplayTest, KeptBuffersGoWithTheDisplaysLastOtherUser) {
    GlContext gl;
    ASSERT_TRUE(gl.ok());
    EGLDisplay display = gl.env()->getEGLDisplay();
    const int files = Test_openFiles();
    // Storage shared with the GPU (16 wide) and storage of the mirror's own.
    for (int w : {16, 4}) useAndDrop(display, w, 4, HAL_PIXEL_FORMAT_RGBA_8888);
    EXPECT_GT(Test_openFiles(), files);
    // The kept buffer holds the host context and its display reference...
    EXPECT_NE(eglQueryString(display, EGL_VENDOR), nullptr);
    gl.release();
    // ...until the environment's eglTerminate: then both go, and the display ends.
    EXPECT_EQ(eglQueryString(display, EGL_VENDOR), nullptr);
    EXPECT_EQ(Test_openFiles(), files);

    // A buffer that outlives every other user of the display is not kept.
    GlContext again;
    ASSERT_TRUE(again.ok());
    display = again.env()->getEGLDisplay();
    sp<GraphicBuffer> late = new GraphicBuffer(4, 4, HAL_PIXEL_FORMAT_RGBA_8888, kRenderUsage);
    EXPECT_FALSE(GlTest_bufferPixels(display, late).empty());
    again.release();
    EXPECT_NE(eglQueryString(display, EGL_VENDOR), nullptr);  // the live buffer's mirror
    late.clear();
    EXPECT_EQ(eglQueryString(display, EGL_VENDOR), nullptr);
}

}  // namespace
