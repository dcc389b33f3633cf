// The host window (slots, FIFO, dropping, perform/query) and the host EGL
// window surface whose swap queues the rendered frame into it, following the
// window's size from frame to frame.
#include <gui/HostWindow.h>

#include <android/native_window.h>
#include <gtest/gtest.h>

#include <vector>

#include "core/egl/EglEnvironment.h"
#include "core/egl/EglNativeSeam.h"
#include "core/egl/EglWindowSurface.h"
#include "support/gl_context.h"

using android::GraphicBuffer;
using android::HostWindow;
using android::sp;

namespace {

ANativeWindowBuffer* dequeue(ANativeWindow* window) {
    ANativeWindowBuffer* buffer = nullptr;
    int fence = 0;
    if (window->dequeueBuffer(window, &buffer, &fence) != 0) return nullptr;
    EXPECT_EQ(fence, -1);
    return buffer;
}

TEST(HostWindowTest, SlotsQueueInOrderAndDropTheOldestWhenFull) {
    sp<HostWindow> window = new HostWindow(64, 32);
    ANativeWindow* anw = window.get();
    EXPECT_EQ(ANativeWindow_getWidth(anw), 64);
    EXPECT_EQ(ANativeWindow_getHeight(anw), 32);
    EXPECT_EQ(ANativeWindow_getFormat(anw), HAL_PIXEL_FORMAT_RGBA_8888);
    EXPECT_EQ(window->getBufferCount(), 3);

    sp<GraphicBuffer> none;
    EXPECT_EQ(window->acquireFrame(&none, nullptr, nullptr), android::WOULD_BLOCK);

    ANativeWindowBuffer* a = dequeue(anw);
    ANativeWindowBuffer* b = dequeue(anw);
    ASSERT_NE(a, nullptr);
    ASSERT_NE(b, nullptr);
    EXPECT_NE(a, b);
    EXPECT_EQ(a->width, 64);
    EXPECT_EQ(a->height, 32);
    EXPECT_EQ(anw->queueBuffer(anw, b, -1), 0);
    EXPECT_EQ(anw->queueBuffer(anw, b, -1), android::BAD_VALUE);  // not dequeued any more
    EXPECT_EQ(anw->queueBuffer(anw, a, -1), 0);

    sp<GraphicBuffer> first;
    uint64_t number = 0;
    ASSERT_EQ(window->acquireFrame(&first, &number, nullptr), android::NO_ERROR);
    EXPECT_EQ(first->getNativeBuffer(), b);
    EXPECT_EQ(number, 1u);

    // Slots: b acquired, a queued, one free. Two more dequeues: the free
    // one, then the queued frame's slot is taken and that frame dropped.
    ANativeWindowBuffer* c = dequeue(anw);
    ANativeWindowBuffer* d = dequeue(anw);
    ASSERT_NE(c, nullptr);
    ASSERT_EQ(d, a);
    EXPECT_EQ(window->droppedTotal(), 1u);
    EXPECT_EQ(dequeue(anw), nullptr);  // everything is out
    EXPECT_EQ(anw->cancelBuffer(anw, d, -1), 0);
    EXPECT_EQ(anw->queueBuffer(anw, c, -1), 0);
    EXPECT_EQ(window->releaseFrame(first), android::NO_ERROR);
    EXPECT_EQ(window->releaseFrame(first), android::BAD_VALUE);
    sp<GraphicBuffer> second;
    ASSERT_EQ(window->acquireFrame(&second, &number, nullptr), android::NO_ERROR);
    EXPECT_EQ(second->getNativeBuffer(), c);
    EXPECT_EQ(number, 3u);
    EXPECT_EQ(window->queuedTotal(), 3u);
}

TEST(HostWindowTest, PerformChangesGeometryCountUsageAndConnection) {
    sp<HostWindow> window = new HostWindow(16, 16);
    ANativeWindow* anw = window.get();
    EXPECT_EQ(native_window_set_buffer_count(anw, 5), 0);
    EXPECT_EQ(window->getBufferCount(), 5);
    EXPECT_EQ(native_window_set_buffer_count(anw, 9), android::BAD_VALUE);
    EXPECT_EQ(anw->perform(anw, NATIVE_WINDOW_SET_USAGE, 0x08002030), 0);
    EXPECT_EQ(window->getConsumerUsage(), 0x08002030u);

    EXPECT_EQ(ANativeWindow_setBuffersGeometry(anw, 40, 20, HAL_PIXEL_FORMAT_YCrCb_420_SP), 0);
    EXPECT_EQ(ANativeWindow_getWidth(anw), 40);
    EXPECT_EQ(ANativeWindow_getFormat(anw), HAL_PIXEL_FORMAT_YCrCb_420_SP);
    ANativeWindowBuffer* buffer = dequeue(anw);
    ASSERT_NE(buffer, nullptr);
    EXPECT_EQ(buffer->width, 40);
    EXPECT_EQ(buffer->format, HAL_PIXEL_FORMAT_YCrCb_420_SP);
    EXPECT_EQ(buffer->usage, 0x08002030u);
    // The count cannot change while a buffer is out.
    EXPECT_EQ(native_window_set_buffer_count(anw, 3), android::INVALID_OPERATION);
    EXPECT_EQ(anw->cancelBuffer(anw, buffer, -1), 0);
    EXPECT_EQ(ANativeWindow_setBuffersGeometry(anw, 0, 0, 0), 0);
    EXPECT_EQ(ANativeWindow_getWidth(anw), 16);  // back to the default

    EXPECT_EQ(native_window_api_connect(anw, NATIVE_WINDOW_API_EGL), 0);
    EXPECT_EQ(native_window_api_connect(anw, NATIVE_WINDOW_API_CPU), android::BAD_VALUE);
    EXPECT_EQ(native_window_api_disconnect(anw, NATIVE_WINDOW_API_EGL), 0);

    // sp<ANativeWindow> counts on the window itself.
    {
        sp<ANativeWindow> plain = anw;
        EXPECT_EQ(window->getStrongCount(), 2);
    }
    EXPECT_EQ(window->getStrongCount(), 1);
}

class HostWindowSurfaceTest : public GlContextTest {};

// The next queued frame is w x h and holds GlTest_fillHalves(w, h) top row
// first: the upper half blue, the lower half red, every pixel opaque.
void expectHalvesFrame(const sp<HostWindow>& window, int w, int h) {
    sp<GraphicBuffer> frame;
    ASSERT_EQ(window->acquireFrame(&frame, nullptr, nullptr), android::NO_ERROR);
    ASSERT_EQ(frame->getWidth(), (uint32_t)w);
    ASSERT_EQ(frame->getHeight(), (uint32_t)h);
    void* address = nullptr;
    ASSERT_EQ(frame->lock(GraphicBuffer::USAGE_SW_READ_OFTEN, &address), android::NO_ERROR);
    for (int y = 0; y < h; ++y) {
        const uint8_t* row = static_cast<uint8_t*>(address) + (size_t)y * frame->getStride() * 4;
        const std::vector<uint8_t> want = {uint8_t(y >= h / 2 ? 255 : 0), 0,
                                           uint8_t(y < h / 2 ? 255 : 0), 255};
        for (int x = 0; x < w; ++x) {
            ASSERT_EQ(std::vector<uint8_t>(row + x * 4, row + x * 4 + 4), want)
                << w << "x" << h << " frame, pixel " << x << "," << y;
        }
    }
    frame->unlock();
    window->releaseFrame(frame);
}

TEST_F(HostWindowSurfaceTest, FramesFollowTheWindowSizeAfterAResize) {
    sp<HostWindow> window = new HostWindow(8, 4);
    sp<EglWindowSurface> surface =
        new EglWindowSurface(mGl->env(), window, EglWindowSurface::SURFACE_PREVIEW);
    ASSERT_EQ(surface->initialize(), 0);
    EGLDisplay display = mGl->env()->getEGLDisplay();
    auto surfaceWidth = [&]() {
        EGLint width = 0;
        eglQuerySurface(display, surface->getEGLSurface(), EGL_WIDTH, &width);
        return width;
    };
    ASSERT_EQ(surface->bindSurface(), 0);
    GlTest_fillHalves(8, 4);
    ASSERT_EQ(surface->swapSurface(), 0);
    ASSERT_NO_FATAL_FAILURE(expectHalvesFrame(window, 8, 4));

    // Resized between frames: the next frame is drawn and queued at the new size.
    surface->setSize(12, 6);
    ASSERT_EQ(surface->bindSurface(), 0);
    EXPECT_EQ(surfaceWidth(), 12);
    EXPECT_EQ(eglGetCurrentSurface(EGL_DRAW), surface->getEGLSurface());
    GlTest_fillHalves(12, 6);
    ASSERT_EQ(surface->swapSurface(), 0);
    ASSERT_NO_FATAL_FAILURE(expectHalvesFrame(window, 12, 6));

    // Resized during a frame: that frame goes into a buffer of the new size,
    // and the swap makes the surface follow, so the next frame needs no bind.
    ASSERT_EQ(surface->bindSurface(), 0);
    GlTest_fillHalves(12, 6);
    surface->setSize(6, 4);
    ASSERT_EQ(surface->swapSurface(), 0);
    sp<GraphicBuffer> fitted;
    ASSERT_EQ(window->acquireFrame(&fitted, nullptr, nullptr), android::NO_ERROR);
    EXPECT_EQ(fitted->getWidth(), 6u);
    window->releaseFrame(fitted);
    EXPECT_EQ(surfaceWidth(), 6);
    EXPECT_EQ(eglGetCurrentSurface(EGL_DRAW), surface->getEGLSurface());
    GlTest_fillHalves(6, 4);
    ASSERT_EQ(surface->swapSurface(), 0);
    ASSERT_NO_FATAL_FAILURE(expectHalvesFrame(window, 6, 4));

    ASSERT_EQ(mGl->surface()->bindSurface(), 0);
    surface->release();
    EXPECT_EQ(window->getConnectedApi(), 0);
}

TEST_F(HostWindowSurfaceTest, SwapQueuesTheRenderedFrameTopRowFirst) {
    const int w = 12;
    const int h = 8;
    sp<HostWindow> window = new HostWindow(w, h);
    EGLDisplay display = mGl->env()->getEGLDisplay();
    EglNativeSeam& seam = EglNativeSeam::get();
    EGLSurface surface =
        seam.createWindowSurface(display, mGl->env()->getEGLConfig(), window.get(), nullptr);
    ASSERT_NE(surface, EGL_NO_SURFACE);
    EXPECT_EQ(window->getConnectedApi(), NATIVE_WINDOW_API_EGL);
    EGLint width = 0;
    eglQuerySurface(display, surface, EGL_WIDTH, &width);
    EXPECT_EQ(width, w);

    // Swapping a surface that is not current fails and queues nothing.
    EXPECT_EQ(seam.swapBuffers(display, &surface), static_cast<EGLBoolean>(EGL_FALSE));
    EXPECT_EQ(window->queuedTotal(), 0u);

    EGLSurface previousDraw = eglGetCurrentSurface(EGL_DRAW);
    ASSERT_TRUE(seam.makeCurrent(display, &surface, mGl->env()->getEGLContext()));
    GlTest_fillHalves(w, h);  // GL's lower half red: the bottom rows of the frame
    EXPECT_EQ(seam.swapBuffers(display, &surface), static_cast<EGLBoolean>(EGL_TRUE));
    ASSERT_NO_FATAL_FAILURE(expectHalvesFrame(window, w, h));

    ASSERT_TRUE(eglMakeCurrent(display, previousDraw, previousDraw, mGl->env()->getEGLContext()));
    EXPECT_EQ(seam.destroySurface(display, surface), static_cast<EGLBoolean>(EGL_TRUE));
    EXPECT_EQ(window->getConnectedApi(), 0);
}

}  // namespace
