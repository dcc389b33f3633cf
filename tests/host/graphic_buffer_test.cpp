// The host GraphicBuffer: layouts, lock rules, and the two sync points
// between its CPU pixels and its GPU mirror, on real Mesa.
// kiv-test-labels: threads
#include <ui/GraphicBuffer.h>

#include <gtest/gtest.h>

#include <thread>
#include <vector>

#include "core/egl/EglEnvironment.h"
#include "core/egl/HalPixelFormat.h"
#include "core/egl/EglExtensions.h"
#include "core/egl/EglNativeSeam.h"
#include "core/egl/EglWindowSurface.h"
#include "graphic_buffer_usage.h"
#include "host/ui/GraphicBufferTestSeam.h"
#include "support/gl_context.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_image.h"

using android::GraphicBuffer;
using android::sp;
using Seam = android::GraphicBufferTestSeam;

namespace {

// Locks and returns the CPU pixels (null on failure, which fails the test).
uint8_t* lock(const sp<GraphicBuffer>& buffer, uint32_t usage) {
    void* address = nullptr;
    EXPECT_EQ(buffer->lock(usage, &address), android::NO_ERROR);
    return static_cast<uint8_t*>(address);
}

// The buffer's GPU storage as this context sees it: its EGL image bound to a
// renderbuffer of a framebuffer, read with glReadPixels (row 0 first).
class BufferView {
public:
    BufferView(EGLDisplay display, const sp<GraphicBuffer>& buffer) : mDisplay(display) {
        mImage = EglNativeSeam::get().createNativeBufferImage(display, buffer.get());
        if (mImage == EGL_NO_IMAGE_KHR) return;
        auto target = EglExtensions::get().glEGLImageTargetRenderbufferStorageOES;
        glGenRenderbuffers(1, &mRenderbuffer);
        glBindRenderbuffer(GL_RENDERBUFFER, mRenderbuffer);
        target(GL_RENDERBUFFER, static_cast<GLeglImageOES>(mImage));
        glGenFramebuffers(1, &mFramebuffer);
        bind();
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
    GLuint mRenderbuffer = 0, mFramebuffer = 0;
    bool mOk = false;
};

// After GlTest_fillHalves: memory rows 0..h/2-1 red, the rest blue.
void expectHalves(const uint8_t* pixels, int w, int h, size_t pitch) {
    for (int y = 0; y < h; ++y) {
        const uint8_t* p = pixels + y * pitch + (w - 1) * 4;
        ASSERT_EQ(p[0], y < h / 2 ? 255 : 0) << "row " << y;
        ASSERT_EQ(p[2], y < h / 2 ? 0 : 255) << "row " << y;
        ASSERT_EQ(p[3], 255) << "row " << y;
    }
}

TEST(GraphicBufferLayout, AllocationLocksAndPlanes) {
    sp<GraphicBuffer> empty = new GraphicBuffer();
    EXPECT_EQ(empty->initCheck(), android::NO_INIT);
    void* pixels = nullptr;
    EXPECT_EQ(empty->lock(kRead, &pixels), android::NO_INIT);
    // Odd 4:2:0 width, unsupported format, stride below width.
    sp<GraphicBuffer> bad[] = {
        new GraphicBuffer(7, 4, HAL_PIXEL_FORMAT_YCrCb_420_SP, kTextureUsage),
        new GraphicBuffer(8, 4, HAL_PIXEL_FORMAT_RGB_565, kTextureUsage),
        new GraphicBuffer(8, 4, HAL_PIXEL_FORMAT_RGBA_8888, kTextureUsage, 6u, "t")};
    for (const auto& b : bad) EXPECT_EQ(b->initCheck(), android::BAD_VALUE);

    sp<GraphicBuffer> rgba =
        new GraphicBuffer(10, 4, HAL_PIXEL_FORMAT_RGBA_8888, kTextureUsage, 16u, "t");
    ASSERT_EQ(rgba->initCheck(), android::NO_ERROR);
    EXPECT_EQ(rgba->getStride(), 16u);
    EXPECT_EQ(rgba->lock(GraphicBuffer::USAGE_HW_TEXTURE, &pixels), android::BAD_VALUE);
    EXPECT_EQ(rgba->unlock(), android::INVALID_OPERATION);
    ASSERT_NE(lock(rgba, kWrite), nullptr);
    EXPECT_EQ(rgba->lock(kRead, &pixels), android::INVALID_OPERATION);
    android_ycbcr ycbcr;
    EXPECT_EQ(rgba->lockYCbCr(kRead, &ycbcr), android::BAD_VALUE);
    EXPECT_EQ(rgba->unlock(), android::NO_ERROR);

    // Chroma planes of 8x6 buffers: {format, cr offset, cb offset, cstride, step}.
    const int planes[3][5] = {{HAL_PIXEL_FORMAT_YCrCb_420_SP, 48, 49, 8, 2},  // V first
                              {HAL_PIXEL_FORMAT_VENDOR_YCbCr_420_SP, 49, 48, 8, 2},
                              {HAL_PIXEL_FORMAT_YV12, 48, 60, 4, 1}};  // V plane, then U
    for (const auto& p : planes) {
        sp<GraphicBuffer> yuv = new GraphicBuffer(8, 6, p[0], kTextureUsage);
        ASSERT_EQ(yuv->lockYCbCr(kRead, &ycbcr), android::NO_ERROR) << p[0];
        uint8_t* y = static_cast<uint8_t*>(ycbcr.y);
        EXPECT_EQ(static_cast<uint8_t*>(ycbcr.cr), y + p[1]) << p[0];
        EXPECT_EQ(static_cast<uint8_t*>(ycbcr.cb), y + p[2]) << p[0];
        EXPECT_EQ(ycbcr.ystride, 8u);
        EXPECT_EQ(ycbcr.cstride, (size_t)p[3]) << p[0];
        EXPECT_EQ(ycbcr.chroma_step, (size_t)p[4]) << p[0];
        EXPECT_EQ(yuv->unlock(), android::NO_ERROR);
        // A plain CPU buffer never touches GL.
        EXPECT_EQ(Seam::uploads(yuv) + Seam::readbacks(yuv), 0u);
    }
}

class GraphicBufferSyncTest : public GlContextTest {
protected:
    EGLDisplay display() { return mGl->env()->getEGLDisplay(); }
};

TEST_F(GraphicBufferSyncTest, CpuWritesReachTheGpuWithRowsAndStrideKept) {
    const int w = 6, h = 4;
    sp<GraphicBuffer> buffer =
        new GraphicBuffer(w, h, HAL_PIXEL_FORMAT_RGBA_8888, kTextureUsage, 8u, "t");
    BufferView view(display(), buffer);
    ASSERT_TRUE(view.ok());

    uint8_t* rows = lock(buffer, kWrite);
    ASSERT_NE(rows, nullptr);
    std::vector<uint8_t> expected;
    for (int yy = 0; yy < h; ++yy) {
        for (int x = 0; x < 8; ++x) {
            uint8_t px[4] = {(uint8_t)(x * 40), (uint8_t)(yy * 60), (uint8_t)(x + yy), 255};
            memcpy(rows + (yy * 8 + x) * 4, px, 4);
            if (x < w) expected.insert(expected.end(), px, px + 4);
        }
    }
    EXPECT_EQ(Seam::uploads(buffer), 0u);
    ASSERT_EQ(buffer->unlock(), android::NO_ERROR);
    EXPECT_EQ(Seam::uploads(buffer), 1u);
    view.bind();
    EXPECT_EQ(GlTest_readPixels(w, h), expected);

    // A read-only lock sends nothing back up; texture-only buffers are never read back.
    lock(buffer, kRead);
    ASSERT_EQ(buffer->unlock(), android::NO_ERROR);
    EXPECT_EQ(Seam::uploads(buffer), 1u);
    EXPECT_EQ(Seam::readbacks(buffer), 0u);
}

// NV21 crosses as the image core's full-range conversion, both ways: through
// GPU storage the CPU reaches (rows packed at 16 pixels, padded at 8) and
// through GL transfers (when the driver cannot share memory).
TEST_F(GraphicBufferSyncTest, Nv21CrossesAsFullRangeRgbaBothWays) {
    auto converted = [](const uint8_t* pixels, int w, int h, uint32_t from, uint32_t to) {
        VCImage* source = VCImage_createWrap(const_cast<uint8_t*>(pixels), w, h, from, 0, 0);
        VCImage* target = VCImage_createNew(w, h, to);
        EXPECT_EQ(VCImage_convert(source, target), 0);
        std::vector<uint8_t> out(target->data, target->data + VCImage_size(target));
        VCImage_destroy(target);
        VCImage_destroy(source);
        return out;
    };
    const int h = 4;
    for (bool shared : {true, false}) {
        for (int w : {8, 16}) {
            SCOPED_TRACE(::testing::Message() << w << " wide, shared " << shared);
            Seam::allowSharedStorage(shared);
            sp<GraphicBuffer> buffer =
                new GraphicBuffer(w, h, HAL_PIXEL_FORMAT_YCrCb_420_SP, kTextureUsage);
            BufferView view(display(), buffer);
            ASSERT_TRUE(view.ok());
            uint8_t* nv21 = lock(buffer, kWrite);
            ASSERT_NE(nv21, nullptr);
            for (int i = 0; i < w * h; ++i) nv21[i] = (uint8_t)(16 + i * 7);
            for (int i = 0; i < w * h / 2; ++i)
                nv21[w * h + i] = (uint8_t)(i % 2 ? 40 + i * 9 : 230 - i * 11);
            ASSERT_EQ(buffer->unlock(), android::NO_ERROR);
            view.bind();
            EXPECT_EQ(GlTest_readPixels(w, h),
                      converted(nv21, w, h, VC_FORMAT_NV21, VC_FORMAT_RGBA));
            // The CPU copy is the original, not the (lossy) RGBA mirror.
            EXPECT_EQ(lock(buffer, kRead)[5], 16 + 5 * 7);
            EXPECT_EQ(buffer->unlock(), android::NO_ERROR);
            EXPECT_EQ(Seam::uploads(buffer), 1u);
            EXPECT_EQ(Seam::readbacks(buffer), 0u);

            // Rendered RGBA comes back converted to NV21.
            sp<GraphicBuffer> target =
                new GraphicBuffer(w, h, HAL_PIXEL_FORMAT_YCrCb_420_SP, kRenderUsage);
            BufferView targetView(display(), target);
            ASSERT_TRUE(targetView.ok());
            targetView.bind();
            GlTest_fillHalves(w, h);
            std::vector<uint8_t> rendered = GlTest_readPixels(w, h);
            const uint8_t* back = lock(target, kRead);
            ASSERT_NE(back, nullptr);
            EXPECT_EQ(std::vector<uint8_t>(back, back + w * h * 3 / 2),
                      converted(rendered.data(), w, h, VC_FORMAT_RGBA, VC_FORMAT_NV21));
            EXPECT_EQ(target->unlock(), android::NO_ERROR);
            EXPECT_EQ(Seam::readbacks(target), 1u);
            EXPECT_FALSE(Seam::sharesGpuStorage(target));
        }
    }
    Seam::allowSharedStorage(true);
}

TEST_F(GraphicBufferSyncTest, GpuRenderingReachesTheCpuOnTheRenderingThread) {
    const int w = 8, h = 6;
    sp<GraphicBuffer> buffer =
        new GraphicBuffer(w, h, HAL_PIXEL_FORMAT_RGBA_8888, kRenderUsage, 12u, "t");
    BufferView view(display(), buffer);
    ASSERT_TRUE(view.ok());
    view.bind();
    GlTest_fillHalves(w, h);
    // No flush here: the lock fences the current context itself.
    uint8_t* pixels = lock(buffer, kRead);
    ASSERT_NE(pixels, nullptr);
    expectHalves(pixels, w, h, 12 * 4);
    EXPECT_EQ(buffer->unlock(), android::NO_ERROR);
    EXPECT_EQ(Seam::readbacks(buffer), 1u);
    // The caller's context and framebuffer binding are as they were.
    EXPECT_EQ(eglGetCurrentContext(), mGl->env()->getEGLContext());
    glClearColor(0.0f, 1.0f, 0.0f, 1.0f);
    glClear(GL_COLOR_BUFFER_BIT);
    pixels = lock(buffer, kRead);
    EXPECT_EQ(pixels[0], 0);
    EXPECT_EQ(pixels[1], 255);
    EXPECT_EQ(buffer->unlock(), android::NO_ERROR);

    // A read-write lock that changes nothing sends nothing back up; a change does.
    lock(buffer, kRead | kWrite);
    EXPECT_EQ(buffer->unlock(), android::NO_ERROR);
    EXPECT_EQ(Seam::uploads(buffer), 0u);
    lock(buffer, kRead | kWrite)[0] = 99;
    EXPECT_EQ(buffer->unlock(), android::NO_ERROR);
    EXPECT_EQ(Seam::uploads(buffer), 1u);
    view.bind();
    EXPECT_EQ(GlTest_readPixels(1, 1)[0], 99);
}

TEST_F(GraphicBufferSyncTest, GpuRenderingReachesALockOnAThreadWithoutContext) {
    const int w = 10, h = 8;
    sp<GraphicBuffer> buffer = new GraphicBuffer(w, h, HAL_PIXEL_FORMAT_RGBA_8888, kRenderUsage);
    {
        BufferView view(display(), buffer);
        ASSERT_TRUE(view.ok());
        view.bind();
        GlTest_fillHalves(w, h);
        glFlush();  // the hand-over to another thread, as on a device

        std::vector<uint8_t> copy;
        EGLContext threadContext = EGL_NO_CONTEXT;
        std::thread reader([&] {
            void* address = nullptr;
            if (buffer->lock(kRead, &address) != android::NO_ERROR) return;
            const uint8_t* p = static_cast<uint8_t*>(address);
            copy.assign(p, p + w * h * 4);
            buffer->unlock();
            threadContext = eglGetCurrentContext();
        });
        reader.join();
        ASSERT_EQ(copy.size(), static_cast<size_t>(w * h * 4));
        expectHalves(copy.data(), w, h, w * 4);
        EXPECT_EQ(threadContext, EGL_NO_CONTEXT);  // the borrowed context was given back
    }
    // Rendered before the image went away: still read back on the next lock.
    EXPECT_EQ(Seam::readbacks(buffer), 1u);
}

// 16 RGBA pixels make a row exactly as long as Mesa's texture rows: such a
// buffer's CPU pixels are the GPU's storage, and nothing is ever copied.
TEST_F(GraphicBufferSyncTest, RgbaRowsLaidOutAsTheDriversShareOneStorage) {
    const int w = 16, h = 6;
    sp<GraphicBuffer> buffer = new GraphicBuffer(w, h, HAL_PIXEL_FORMAT_RGBA_8888, kRenderUsage);
    uint8_t* pixels = lock(buffer, kWrite);
    ASSERT_NE(pixels, nullptr);
    std::vector<uint8_t> pattern(w * h * 4);
    for (size_t i = 0; i < pattern.size(); ++i) pattern[i] = static_cast<uint8_t>(i * 7 + 3);
    memcpy(pixels, pattern.data(), pattern.size());
    ASSERT_EQ(buffer->unlock(), android::NO_ERROR);

    BufferView view(display(), buffer);
    ASSERT_TRUE(view.ok());
    EXPECT_TRUE(Seam::sharesGpuStorage(buffer));
    view.bind();
    EXPECT_EQ(GlTest_readPixels(w, h), pattern);  // written before the image existed

    // A CPU write shows at once; the same memory comes back on every lock.
    uint8_t* again = lock(buffer, kWrite);
    EXPECT_EQ(again, pixels);
    memset(again, 0x44, pattern.size());
    ASSERT_EQ(buffer->unlock(), android::NO_ERROR);
    view.bind();
    EXPECT_EQ(GlTest_readPixels(w, h), std::vector<uint8_t>(pattern.size(), 0x44));

    // Rendering, not flushed: the lock waits for it.
    view.bind();
    GlTest_fillHalves(w, h);
    pixels = lock(buffer, kRead);
    ASSERT_NE(pixels, nullptr);
    expectHalves(pixels, w, h, w * 4);
    EXPECT_EQ(buffer->unlock(), android::NO_ERROR);
    EXPECT_EQ(Seam::uploads(buffer) + Seam::readbacks(buffer), 0u);

    // Rows padded differently (10 pixels) keep a copy on each side.
    sp<GraphicBuffer> narrow = new GraphicBuffer(10, 4, HAL_PIXEL_FORMAT_RGBA_8888, kRenderUsage);
    BufferView narrowView(display(), narrow);
    ASSERT_TRUE(narrowView.ok());
    EXPECT_FALSE(Seam::sharesGpuStorage(narrow));
}

// Work flushed by one thread is complete for a lock on another, even when the
// lock comes long before the rasterizer could have finished a picture this big.
TEST_F(GraphicBufferSyncTest, SharedStorageIsCompleteForALockOnAnotherThread) {
    const int w = 2048, h = 2048;
    sp<GraphicBuffer> buffer = new GraphicBuffer(w, h, HAL_PIXEL_FORMAT_RGBA_8888, kRenderUsage);
    BufferView view(display(), buffer);
    ASSERT_TRUE(view.ok());
    ASSERT_TRUE(Seam::sharesGpuStorage(buffer));
    view.bind();
    GlTest_fillHalves(w, h);
    glFlush();
    bool locked = false;
    std::vector<uint8_t> column;  // the last pixel of every row
    std::thread reader([&] {
        void* address = nullptr;
        if (buffer->lock(kRead, &address) != android::NO_ERROR) return;
        locked = true;
        const uint8_t* p = static_cast<const uint8_t*>(address);
        for (int y = 0; y < h; ++y)
            column.insert(column.end(), p + (y * w + w - 1) * 4, p + (y * w + w) * 4);
        buffer->unlock();
    });
    reader.join();
    ASSERT_TRUE(locked);
    expectHalves(column.data(), 1, h, 4);
}

TEST_F(GraphicBufferSyncTest, BufferOutlivesTheEnvironmentThatTerminatedTheDisplay) {
    const int w = 4, h = 4;
    sp<GraphicBuffer> buffer = new GraphicBuffer(w, h, HAL_PIXEL_FORMAT_RGBA_8888, kTextureUsage);
    memset(lock(buffer, kWrite), 77, w * h * 4);
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
    EXPECT_EQ(Seam::uploads(buffer), 0u);  // the first write predates the mirror
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
    EXPECT_EQ(eglQueryString(display, EGL_VENDOR), nullptr);  // the last reference ends it
}

}  // namespace
