// The host GraphicBuffer: layouts, lock rules, and the two sync points
// between its CPU pixels and its GPU mirror, on real Mesa.
// kiv-test-labels: threads
#include <ui/GraphicBuffer.h>

#include <gtest/gtest.h>

#include <thread>
#include <vector>

#include "core/egl/EglEnvironment.h"
#include "core/egl/EglNativeSeam.h"
#include "core/egl/EglWindowSurface.h"
#include "support/gl_context.h"

using android::GraphicBuffer;
using android::sp;

namespace {

const uint32_t kTextureUsage = GraphicBuffer::USAGE_HW_TEXTURE |
                               GraphicBuffer::USAGE_SW_READ_OFTEN |
                               GraphicBuffer::USAGE_SW_WRITE_OFTEN;
const uint32_t kRenderUsage = kTextureUsage | GraphicBuffer::USAGE_HW_RENDER;

int clamp255(double v) {
    return v < 0 ? 0 : v > 255 ? 255 : (int)v;
}

// Full-range YUV -> RGB, truncated then clamped.
void yuvToRgb(int y, int u, int v, int* rgb) {
    double cu = u - 128.0;
    double cv = v - 128.0;
    rgb[0] = clamp255((double)(int)(y + 1.402 * cv));
    rgb[1] = clamp255((double)(int)(y - 0.34414 * cu - 0.71414 * cv));
    rgb[2] = clamp255((double)(int)(y + 1.772 * cu));
}

// The buffer's GPU storage as this context sees it: its EGL image bound to a
// renderbuffer of a framebuffer, read with glReadPixels (row 0 first).
class BufferView {
public:
    BufferView(EGLDisplay display, const sp<GraphicBuffer>& buffer) : mDisplay(display) {
        mImage = EglNativeSeam::get().createNativeBufferImage(display, buffer.get());
        if (mImage == EGL_NO_IMAGE_KHR) return;
        auto target = reinterpret_cast<PFNGLEGLIMAGETARGETRENDERBUFFERSTORAGEOESPROC>(
            eglGetProcAddress("glEGLImageTargetRenderbufferStorageOES"));
        glGenRenderbuffers(1, &mRenderbuffer);
        glBindRenderbuffer(GL_RENDERBUFFER, mRenderbuffer);
        target(GL_RENDERBUFFER, static_cast<GLeglImageOES>(mImage));
        glGenFramebuffers(1, &mFramebuffer);
        glBindFramebuffer(GL_FRAMEBUFFER, mFramebuffer);
        glFramebufferRenderbuffer(GL_FRAMEBUFFER, GL_COLOR_ATTACHMENT0, GL_RENDERBUFFER,
                                  mRenderbuffer);
        mOk = glCheckFramebufferStatus(GL_FRAMEBUFFER) == GL_FRAMEBUFFER_COMPLETE;
    }
    ~BufferView() {
        glBindFramebuffer(GL_FRAMEBUFFER, 0);
        glDeleteFramebuffers(1, &mFramebuffer);
        glDeleteRenderbuffers(1, &mRenderbuffer);
        if (mImage != EGL_NO_IMAGE_KHR) EglNativeSeam::get().destroyImage(mDisplay, mImage);
    }
    bool ok() const { return mOk; }
    void bind() { glBindFramebuffer(GL_FRAMEBUFFER, mFramebuffer); }

private:
    EGLDisplay mDisplay;
    EGLImageKHR mImage = EGL_NO_IMAGE_KHR;
    GLuint mRenderbuffer = 0;
    GLuint mFramebuffer = 0;
    bool mOk = false;
};

// Red in the lower half of GL rows (memory rows 0..h/2-1), blue above.
void renderHalves(int w, int h) {
    glViewport(0, 0, w, h);
    glClearColor(0.0f, 0.0f, 1.0f, 1.0f);
    glClear(GL_COLOR_BUFFER_BIT);
    glEnable(GL_SCISSOR_TEST);
    glScissor(0, 0, w, h / 2);
    glClearColor(1.0f, 0.0f, 0.0f, 1.0f);
    glClear(GL_COLOR_BUFFER_BIT);
    glDisable(GL_SCISSOR_TEST);
}

void expectHalves(const uint8_t* pixels, int w, int h, size_t pitch) {
    for (int y = 0; y < h; ++y) {
        const uint8_t* p = pixels + y * pitch + (w - 1) * 4;
        bool lower = y < h / 2;
        ASSERT_EQ(p[0], lower ? 255 : 0) << "row " << y;
        ASSERT_EQ(p[2], lower ? 0 : 255) << "row " << y;
        ASSERT_EQ(p[3], 255) << "row " << y;
    }
}

TEST(GraphicBufferLayout, AllocationLocksAndPlanes) {
    sp<GraphicBuffer> empty = new GraphicBuffer();
    EXPECT_EQ(empty->initCheck(), android::NO_INIT);
    void* pixels = nullptr;
    EXPECT_EQ(empty->lock(GraphicBuffer::USAGE_SW_READ_OFTEN, &pixels), android::NO_INIT);

    sp<GraphicBuffer> oddNv21 =
        new GraphicBuffer(7, 4, HAL_PIXEL_FORMAT_YCrCb_420_SP, kTextureUsage);
    EXPECT_EQ(oddNv21->initCheck(), android::BAD_VALUE);  // odd 4:2:0 width
    sp<GraphicBuffer> rgb565 = new GraphicBuffer(8, 4, HAL_PIXEL_FORMAT_RGB_565, kTextureUsage);
    EXPECT_EQ(rgb565->initCheck(), android::BAD_VALUE);
    sp<GraphicBuffer> narrow =
        new GraphicBuffer(8, 4, HAL_PIXEL_FORMAT_RGBA_8888, kTextureUsage, 6u, "t");
    EXPECT_EQ(narrow->initCheck(), android::BAD_VALUE);  // stride below width

    sp<GraphicBuffer> rgba =
        new GraphicBuffer(10, 4, HAL_PIXEL_FORMAT_RGBA_8888, kTextureUsage, 16u, "t");
    ASSERT_EQ(rgba->initCheck(), android::NO_ERROR);
    EXPECT_EQ(rgba->getStride(), 16u);
    EXPECT_EQ(rgba->lock(GraphicBuffer::USAGE_HW_TEXTURE, &pixels), android::BAD_VALUE);
    EXPECT_EQ(rgba->unlock(), android::INVALID_OPERATION);
    ASSERT_EQ(rgba->lock(GraphicBuffer::USAGE_SW_WRITE_OFTEN, &pixels), android::NO_ERROR);
    ASSERT_NE(pixels, nullptr);
    EXPECT_EQ(rgba->lock(GraphicBuffer::USAGE_SW_READ_OFTEN, &pixels), android::INVALID_OPERATION);
    android_ycbcr ycbcr;
    EXPECT_EQ(rgba->lockYCbCr(GraphicBuffer::USAGE_SW_READ_OFTEN, &ycbcr), android::BAD_VALUE);
    EXPECT_EQ(rgba->unlock(), android::NO_ERROR);

    // NV21: V first in the interleaved plane right after the luma rows.
    sp<GraphicBuffer> nv21 = new GraphicBuffer(8, 6, HAL_PIXEL_FORMAT_YCrCb_420_SP, kTextureUsage);
    ASSERT_EQ(nv21->lockYCbCr(GraphicBuffer::USAGE_SW_READ_OFTEN, &ycbcr), android::NO_ERROR);
    uint8_t* y = static_cast<uint8_t*>(ycbcr.y);
    EXPECT_EQ(static_cast<uint8_t*>(ycbcr.cr), y + 48);
    EXPECT_EQ(static_cast<uint8_t*>(ycbcr.cb), y + 49);
    EXPECT_EQ(ycbcr.ystride, 8u);
    EXPECT_EQ(ycbcr.cstride, 8u);
    EXPECT_EQ(ycbcr.chroma_step, 2u);
    EXPECT_EQ(nv21->unlock(), android::NO_ERROR);

    sp<GraphicBuffer> nv12 =
        new GraphicBuffer(8, 6, HAL_PIXEL_FORMAT_VENDOR_YCbCr_420_SP, kTextureUsage);
    ASSERT_EQ(nv12->lockYCbCr(GraphicBuffer::USAGE_SW_READ_OFTEN, &ycbcr), android::NO_ERROR);
    y = static_cast<uint8_t*>(ycbcr.y);
    EXPECT_EQ(static_cast<uint8_t*>(ycbcr.cb), y + 48);
    EXPECT_EQ(static_cast<uint8_t*>(ycbcr.cr), y + 49);
    EXPECT_EQ(nv12->unlock(), android::NO_ERROR);

    // YV12: V plane, then U plane, each a quarter of the luma.
    sp<GraphicBuffer> yv12 = new GraphicBuffer(8, 6, HAL_PIXEL_FORMAT_YV12, kTextureUsage);
    ASSERT_EQ(yv12->lockYCbCr(GraphicBuffer::USAGE_SW_READ_OFTEN, &ycbcr), android::NO_ERROR);
    y = static_cast<uint8_t*>(ycbcr.y);
    EXPECT_EQ(static_cast<uint8_t*>(ycbcr.cr), y + 48);
    EXPECT_EQ(static_cast<uint8_t*>(ycbcr.cb), y + 60);
    EXPECT_EQ(ycbcr.cstride, 4u);
    EXPECT_EQ(ycbcr.chroma_step, 1u);
    EXPECT_EQ(yv12->unlock(), android::NO_ERROR);

    // A plain CPU buffer never touches GL.
    EXPECT_EQ(nv21->getUploadCount() + nv21->getReadbackCount(), 0u);
}

class GraphicBufferSyncTest : public GlContextTest {
protected:
    EGLDisplay display() { return mGl->env()->getEGLDisplay(); }
};

TEST_F(GraphicBufferSyncTest, CpuWritesReachTheGpuWithRowsAndStrideKept) {
    const int w = 6;
    const int h = 4;
    sp<GraphicBuffer> buffer =
        new GraphicBuffer(w, h, HAL_PIXEL_FORMAT_RGBA_8888, kTextureUsage, 8u, "t");
    BufferView view(display(), buffer);
    ASSERT_TRUE(view.ok());

    void* address = nullptr;
    ASSERT_EQ(buffer->lock(GraphicBuffer::USAGE_SW_WRITE_OFTEN, &address), android::NO_ERROR);
    uint8_t* rows = static_cast<uint8_t*>(address);
    std::vector<uint8_t> expected;
    for (int yy = 0; yy < h; ++yy) {
        for (int x = 0; x < 8; ++x) {
            uint8_t px[4] = {(uint8_t)(x * 40), (uint8_t)(yy * 60), (uint8_t)(x + yy), 255};
            memcpy(rows + (yy * 8 + x) * 4, px, 4);
            if (x < w) expected.insert(expected.end(), px, px + 4);
        }
    }
    EXPECT_EQ(buffer->getUploadCount(), 0u);
    ASSERT_EQ(buffer->unlock(), android::NO_ERROR);
    EXPECT_EQ(buffer->getUploadCount(), 1u);

    view.bind();
    EXPECT_EQ(GlTest_readPixels(w, h), expected);

    // A read-only lock sends nothing back up.
    ASSERT_EQ(buffer->lock(GraphicBuffer::USAGE_SW_READ_OFTEN, &address), android::NO_ERROR);
    ASSERT_EQ(buffer->unlock(), android::NO_ERROR);
    EXPECT_EQ(buffer->getUploadCount(), 1u);
    // Texture-only buffers are never read back.
    EXPECT_EQ(buffer->getReadbackCount(), 0u);
}

TEST_F(GraphicBufferSyncTest, Nv21WritesReachTheGpuAsFullRangeRgba) {
    const int w = 8;
    const int h = 4;
    sp<GraphicBuffer> buffer =
        new GraphicBuffer(w, h, HAL_PIXEL_FORMAT_YCrCb_420_SP, kTextureUsage);
    BufferView view(display(), buffer);
    ASSERT_TRUE(view.ok());
    void* address = nullptr;
    ASSERT_EQ(buffer->lock(GraphicBuffer::USAGE_SW_WRITE_OFTEN, &address), android::NO_ERROR);
    uint8_t* nv21 = static_cast<uint8_t*>(address);
    for (int i = 0; i < w * h; ++i) nv21[i] = (uint8_t)(16 + i * 7);
    for (int i = 0; i < w * h / 2; ++i)
        nv21[w * h + i] = (uint8_t)(i % 2 ? 40 + i * 9 : 230 - i * 11);
    ASSERT_EQ(buffer->unlock(), android::NO_ERROR);

    view.bind();
    std::vector<uint8_t> gpu = GlTest_readPixels(w, h);
    for (int yy = 0; yy < h; ++yy) {
        for (int x = 0; x < w; ++x) {
            const uint8_t* vu = nv21 + w * h + (yy / 2) * w + (x / 2) * 2;
            int rgb[3];
            yuvToRgb(nv21[yy * w + x], vu[1], vu[0], rgb);
            const uint8_t* p = &gpu[(yy * w + x) * 4];
            for (int c = 0; c < 3; ++c) EXPECT_NEAR(p[c], rgb[c], 1) << x << "," << yy << " c" << c;
            EXPECT_EQ(p[3], 255);
        }
    }
    // The CPU copy is the original: a later lock does not replace it with
    // the (lossy) RGBA mirror.
    ASSERT_EQ(buffer->lock(GraphicBuffer::USAGE_SW_READ_OFTEN, &address), android::NO_ERROR);
    EXPECT_EQ(static_cast<uint8_t*>(address)[5], 16 + 5 * 7);
    EXPECT_EQ(buffer->unlock(), android::NO_ERROR);
    EXPECT_EQ(buffer->getReadbackCount(), 0u);
}

TEST_F(GraphicBufferSyncTest, GpuRenderingReachesTheCpuOnTheRenderingThread) {
    const int w = 8;
    const int h = 6;
    sp<GraphicBuffer> buffer =
        new GraphicBuffer(w, h, HAL_PIXEL_FORMAT_RGBA_8888, kRenderUsage, 12u, "t");
    BufferView view(display(), buffer);
    ASSERT_TRUE(view.ok());
    view.bind();
    renderHalves(w, h);
    // No flush here: the lock fences the current context itself.
    void* address = nullptr;
    ASSERT_EQ(buffer->lock(GraphicBuffer::USAGE_SW_READ_OFTEN, &address), android::NO_ERROR);
    expectHalves(static_cast<uint8_t*>(address), w, h, 12 * 4);
    EXPECT_EQ(buffer->unlock(), android::NO_ERROR);
    EXPECT_EQ(buffer->getReadbackCount(), 1u);
    // The caller's context and framebuffer binding are as they were.
    EXPECT_EQ(eglGetCurrentContext(), mGl->env()->getEGLContext());
    glClearColor(0.0f, 1.0f, 0.0f, 1.0f);
    glClear(GL_COLOR_BUFFER_BIT);
    ASSERT_EQ(buffer->lock(GraphicBuffer::USAGE_SW_READ_OFTEN, &address), android::NO_ERROR);
    EXPECT_EQ(static_cast<uint8_t*>(address)[1], 255);
    EXPECT_EQ(static_cast<uint8_t*>(address)[0], 0);
    EXPECT_EQ(buffer->unlock(), android::NO_ERROR);

    // A read-write lock that changes nothing sends nothing back up; a change does.
    const uint32_t readWrite =
        GraphicBuffer::USAGE_SW_READ_OFTEN | GraphicBuffer::USAGE_SW_WRITE_OFTEN;
    ASSERT_EQ(buffer->lock(readWrite, &address), android::NO_ERROR);
    EXPECT_EQ(buffer->unlock(), android::NO_ERROR);
    EXPECT_EQ(buffer->getUploadCount(), 0u);
    ASSERT_EQ(buffer->lock(readWrite, &address), android::NO_ERROR);
    static_cast<uint8_t*>(address)[0] = 99;
    EXPECT_EQ(buffer->unlock(), android::NO_ERROR);
    EXPECT_EQ(buffer->getUploadCount(), 1u);
    view.bind();
    EXPECT_EQ(GlTest_readPixels(1, 1)[0], 99);
}

TEST_F(GraphicBufferSyncTest, GpuRenderingReachesALockOnAThreadWithoutContext) {
    const int w = 10;
    const int h = 8;
    sp<GraphicBuffer> buffer = new GraphicBuffer(w, h, HAL_PIXEL_FORMAT_RGBA_8888, kRenderUsage);
    {
        BufferView view(display(), buffer);
        ASSERT_TRUE(view.ok());
        view.bind();
        renderHalves(w, h);
        glFlush();  // the hand-over to another thread, as on a device

        std::vector<uint8_t> copy;
        EGLContext threadContext = EGL_NO_CONTEXT;
        std::thread reader([&] {
            void* address = nullptr;
            if (buffer->lock(GraphicBuffer::USAGE_SW_READ_OFTEN, &address) != android::NO_ERROR) {
                return;
            }
            const uint8_t* p = static_cast<uint8_t*>(address);
            copy.assign(p, p + w * h * 4);
            buffer->unlock();
            threadContext = eglGetCurrentContext();
        });
        reader.join();
        ASSERT_EQ(copy.size(), static_cast<size_t>(w * h * 4));
        expectHalves(copy.data(), w, h, w * 4);
        // The borrowed context was given back.
        EXPECT_EQ(threadContext, EGL_NO_CONTEXT);
    }
    // Rendered before the image went away: still read back on the next lock.
    EXPECT_EQ(buffer->getReadbackCount(), 1u);
}

TEST_F(GraphicBufferSyncTest, BufferOutlivesTheEnvironmentThatTerminatedTheDisplay) {
    const int w = 4;
    const int h = 4;
    sp<GraphicBuffer> buffer = new GraphicBuffer(w, h, HAL_PIXEL_FORMAT_RGBA_8888, kTextureUsage);
    void* address = nullptr;
    ASSERT_EQ(buffer->lock(GraphicBuffer::USAGE_SW_WRITE_OFTEN, &address), android::NO_ERROR);
    memset(address, 77, w * h * 4);
    ASSERT_EQ(buffer->unlock(), android::NO_ERROR);
    {
        BufferView view(display(), buffer);  // makes the mirror
        ASSERT_TRUE(view.ok());
    }
    // The fixture's environment ends (eglTerminate); the host context holds
    // its own reference on the display, so the mirror survives.
    EGLDisplay first = display();
    mGl->release();
    EXPECT_NE(eglQueryString(first, EGL_VENDOR), nullptr);  // still initialised
    GlContext again;
    ASSERT_TRUE(again.ok());
    BufferView view(again.env()->getEGLDisplay(), buffer);
    ASSERT_TRUE(view.ok());
    view.bind();
    EXPECT_EQ(GlTest_readPixels(w, h), std::vector<uint8_t>(w * h * 4, 77));
    EXPECT_EQ(buffer->getUploadCount(), 0u);  // the first write predates the mirror
}

TEST(HostEglDisplayTest, TerminationEndsTheDisplayOnlyWithItsLastUser) {
    GlContext first;
    ASSERT_TRUE(first.ok());
    EGLDisplay display = first.env()->getEGLDisplay();
    {
        GlContext second;  // its own eglInitialize on the same display
        ASSERT_TRUE(second.ok());
        ASSERT_EQ(second.env()->getEGLDisplay(), display);
        second.release();  // its eglTerminate
    }
    // The first environment's context still renders.
    ASSERT_EQ(first.surface()->bindSurface(), 0);  // the second one unbound this thread
    GlTarget target;
    ASSERT_TRUE(GlTest_makeTarget(2, 2, &target));
    glClearColor(0.0f, 1.0f, 0.0f, 1.0f);
    glClear(GL_COLOR_BUFFER_BIT);
    EXPECT_EQ(GlTest_readPixels(2, 2)[1], 255);
    GlTest_deleteTarget(&target);
    EXPECT_NE(eglQueryString(display, EGL_VENDOR), nullptr);
    first.release();
    // The last reference ends it.
    EXPECT_EQ(eglQueryString(display, EGL_VENDOR), nullptr);
}

}  // namespace
