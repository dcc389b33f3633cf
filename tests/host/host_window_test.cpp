// The host window (dropping the oldest frame, perform/query) and the host EGL
// window surface whose swap queues the rendered frame into it, following the
// window's size from frame to frame.
#include <gui/HostWindow.h>

#include <android/native_window.h>
#include <gtest/gtest.h>

#include <vector>

#include "core/egl/EglEnvironment.h"
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

// Slots: b acquired, a queued, one free; two more dequeues take the free one,
// then the queued frame's slot, dropping that frame.
TEST(HostWindowTest, SlotsDropTheOldestQueuedFrameWhenFull) {
    sp<HostWindow> window = new HostWindow(64, 32);
    ANativeWindow* anw = window.get();
    EXPECT_EQ(std::vector<int>({64, 32, HAL_PIXEL_FORMAT_RGBA_8888, 3}),
              std::vector<int>({ANativeWindow_getWidth(anw), ANativeWindow_getHeight(anw),
                                ANativeWindow_getFormat(anw), window->getBufferCount()}));
    sp<GraphicBuffer> first, second;
    EXPECT_EQ(window->acquireFrame(&first, nullptr, nullptr), android::WOULD_BLOCK);
    ANativeWindowBuffer *a = dequeue(anw), *b = dequeue(anw);
    ASSERT_TRUE(a && b && a != b);
    EXPECT_EQ(std::make_pair(64, 32), std::make_pair(a->width, a->height));
    EXPECT_EQ(anw->queueBuffer(anw, b, -1), 0);
    EXPECT_EQ(anw->queueBuffer(anw, b, -1), android::BAD_VALUE);  // not dequeued any more
    EXPECT_EQ(anw->queueBuffer(anw, a, -1), 0);
    uint64_t number = 0;
    ASSERT_EQ(window->acquireFrame(&first, &number, nullptr), android::NO_ERROR);
    EXPECT_EQ(std::make_pair(first->getNativeBuffer(), uint64_t(1)), std::make_pair(b, number));
    ANativeWindowBuffer *c = dequeue(anw), *d = dequeue(anw);
    ASSERT_NE(c, nullptr);
    ASSERT_EQ(d, a);
    EXPECT_EQ(window->droppedTotal(), 1u);
    EXPECT_EQ(dequeue(anw), nullptr);  // everything is out
    EXPECT_EQ(anw->cancelBuffer(anw, d, -1), 0);
    EXPECT_EQ(anw->queueBuffer(anw, c, -1), 0);
    EXPECT_EQ(window->releaseFrame(first), android::NO_ERROR);
    EXPECT_EQ(window->releaseFrame(first), android::BAD_VALUE);
    ASSERT_EQ(window->acquireFrame(&second, &number, nullptr), android::NO_ERROR);
    EXPECT_EQ(std::make_pair(second->getNativeBuffer(), uint64_t(3)), std::make_pair(c, number));
    EXPECT_EQ(window->queuedTotal(), 3u);
}

// The queue's own perform/query rules are buffer_queue_test's; the window
// hands its usage and geometry to the buffers and goes back to its default size.
TEST(HostWindowTest, PerformChangesGeometryCountAndUsage) {
    sp<HostWindow> window = new HostWindow(16, 16);
    ANativeWindow* anw = window.get();
    EXPECT_EQ(native_window_set_buffer_count(anw, 5), 0);
    EXPECT_EQ(window->getBufferCount(), 5);
    EXPECT_EQ(anw->perform(anw, NATIVE_WINDOW_SET_USAGE, 0x08002030), 0);
    EXPECT_EQ(window->getConsumerUsage(), 0x08002030u);
    EXPECT_EQ(ANativeWindow_setBuffersGeometry(anw, 40, 20, HAL_PIXEL_FORMAT_YCrCb_420_SP), 0);
    ANativeWindowBuffer* buffer = dequeue(anw);
    ASSERT_NE(buffer, nullptr);
    EXPECT_EQ(
        std::vector<uint64_t>({40, HAL_PIXEL_FORMAT_YCrCb_420_SP, 0x08002030u}),
        std::vector<uint64_t>({uint64_t(buffer->width), uint64_t(buffer->format), buffer->usage}));
    EXPECT_EQ(anw->cancelBuffer(anw, buffer, -1), 0);
    EXPECT_EQ(ANativeWindow_setBuffersGeometry(anw, 0, 0, 0), 0);
    EXPECT_EQ(ANativeWindow_getWidth(anw), 16);
    {
        sp<ANativeWindow> plain = anw;  // counts on the window itself
        EXPECT_EQ(window->getStrongCount(), 2);
    }
    EXPECT_EQ(window->getStrongCount(), 1);
}

// The next queued frame is w x h and holds GlTest_fillHalves(w, h) top row
// first: the upper half blue, the lower half red, every pixel opaque.
void expectHalvesFrame(const sp<HostWindow>& window, int w, int h) {
    sp<GraphicBuffer> frame;
    ASSERT_EQ(window->acquireFrame(&frame, nullptr, nullptr), android::NO_ERROR);
    ASSERT_EQ(std::make_pair(uint32_t(w), uint32_t(h)),
              std::make_pair(frame->getWidth(), frame->getHeight()));
    void* address = nullptr;
    ASSERT_EQ(frame->lock(GraphicBuffer::USAGE_SW_READ_OFTEN, &address), android::NO_ERROR);
    for (int y = 0; y < h; ++y) {
        const uint8_t* row = static_cast<uint8_t*>(address) + (size_t)y * frame->getStride() * 4;
        const std::vector<uint8_t> want = {uint8_t(y >= h / 2 ? 255 : 0), 0,
                                           uint8_t(y < h / 2 ? 255 : 0), 255};
        for (int x = 0; x < w; ++x)
            ASSERT_EQ(std::vector<uint8_t>(row + x * 4, row + x * 4 + 4), want)
                << w << "x" << h << " at " << x << "," << y;
    }
    frame->unlock();
    window->releaseFrame(frame);
}

// Resized between frames: the next frame is drawn and queued at the new size.
// Resized during a frame: that frame goes into a buffer of the new size, and
// the swap makes the surface follow, so the next frame needs no bind.
TEST_F(GlContextTest, HostWindowFramesFollowTheWindowSize) {
    sp<HostWindow> window = new HostWindow(8, 4);
    sp<EglWindowSurface> surface =
        new EglWindowSurface(mGl->env(), window, EglWindowSurface::SURFACE_PREVIEW);
    ASSERT_EQ(surface->initialize(), 0);
    EXPECT_EQ(window->getConnectedApi(), NATIVE_WINDOW_API_EGL);
    // A swap of a surface that is not current fails and queues nothing.
    EXPECT_NE(surface->swapSurface(), 0);
    EXPECT_EQ(window->queuedTotal(), 0u);
    auto surfaceWidth = [&]() {
        EGLint width = 0;
        eglQuerySurface(mGl->env()->getEGLDisplay(), surface->getEGLSurface(), EGL_WIDTH, &width);
        return width;
    };
    const struct {
        int w, h, resizeW, resizeH;
        bool bind;
    } frames[] = {
        {8, 4, 0, 0, true}, {12, 6, 0, 0, true}, {12, 6, 6, 4, true}, {6, 4, 0, 0, false}};
    for (const auto& f : frames) {
        if (f.bind && f.resizeW == 0) surface->setSize(f.w, f.h);
        ASSERT_TRUE(!f.bind || surface->bindSurface() == 0);
        EXPECT_EQ(f.w, surfaceWidth());
        EXPECT_EQ(eglGetCurrentSurface(EGL_DRAW), surface->getEGLSurface());
        GlTest_fillHalves(f.w, f.h);
        if (f.resizeW != 0) surface->setSize(f.resizeW, f.resizeH);
        ASSERT_EQ(surface->swapSurface(), 0);
        if (f.resizeW == 0) {
            ASSERT_NO_FATAL_FAILURE(expectHalvesFrame(window, f.w, f.h));
            continue;
        }
        sp<GraphicBuffer> fitted;
        ASSERT_EQ(window->acquireFrame(&fitted, nullptr, nullptr), android::NO_ERROR);
        EXPECT_EQ(fitted->getWidth(), uint32_t(f.resizeW));
        window->releaseFrame(fitted);
    }
    ASSERT_EQ(mGl->surface()->bindSurface(), 0);
    surface->release();
    EXPECT_EQ(window->getConnectedApi(), 0);
}

}  // namespace
