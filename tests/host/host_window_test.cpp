// The host window (dropping the oldest frame, perform/query, when frames'
// pixels were there) and the host EGL window surface whose swap queues the
// rendered frame into it, following the window's size from frame to frame,
// with the frame still being drawn into a GPU buffer.
// kiv-test-labels: threads
#include <gui/HostWindow.h>

#include <GLES3/gl3.h>
#include <android/native_window.h>
#include <gtest/gtest.h>
#include <gui/BufferItemConsumer.h>
#include <gui/BufferQueue.h>
#include <utils/Timers.h>

#include <algorithm>
#include <string>
#include <vector>

#include "core/egl/EglEnvironment.h"
#include "core/egl/EglWindowSurface.h"
#include "host/ui/GraphicBufferTestSeam.h"
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

// The frame is w x h and holds GlTest_fillHalves(w, h) top row first: the
// upper half blue, the lower half red, every pixel opaque.
void expectHalves(const sp<GraphicBuffer>& frame, int w, int h) {
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
}

// The next queued frame, as expectHalves() checks it.
void expectHalvesFrame(const sp<HostWindow>& window, int w, int h) {
    sp<GraphicBuffer> frame;
    ASSERT_EQ(window->acquireFrame(&frame, nullptr, nullptr), android::NO_ERROR);
    expectHalves(frame, w, h);
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

// Frame k is a solid colour of its own.
std::vector<uint8_t> frameColour(int k) {
    return {uint8_t(20 + k * 37), uint8_t(250 - k * 29), uint8_t(k * 11), 255};
}

// Whether every pixel of a w x h RGBA frame of `stride` pixels is `colour`.
bool solid(const uint8_t* rows, int w, int h, int stride, const std::vector<uint8_t>& colour) {
    for (int y = 0; y < h; ++y) {
        for (int x = 0; x < w; ++x) {
            if (!std::equal(colour.begin(), colour.end(), rows + ((size_t)y * stride + x) * 4))
                return false;
        }
    }
    return true;
}

struct SwapCase {
    const char* name;
    uint64_t usage;  // the window's; the consumer adds a software read
    bool sharedStorage;
    bool queuedWhileDrawn;  // the GPU copies the frame after the swap returned
};
const SwapCase kSwapCases[] = {
    {"RenderTarget", GraphicBuffer::USAGE_HW_RENDER | GraphicBuffer::USAGE_HW_TEXTURE, true, true},
    {"RenderTargetCopiedByGl", GraphicBuffer::USAGE_HW_RENDER, false, true},
    // The recording target's: for the GPU, not asked to be rendered into.
    {"VideoEncoder", GraphicBuffer::USAGE_HW_VIDEO_ENCODER, true, true},
    {"VideoEncoderCopiedByGl", GraphicBuffer::USAGE_HW_VIDEO_ENCODER, false, true},
    {"SoftwareOnly", GraphicBuffer::USAGE_SW_WRITE_OFTEN, true, false},
};

class SwapTest : public GlContextTest, public ::testing::WithParamInterface<SwapCase> {
protected:
    void TearDown() override {
        android::GraphicBufferTestSeam::allowSharedStorage(true);
        GlContextTest::TearDown();
    }
};

// Each frame is queued (with its draw still in flight for GPU buffers) and
// holds exactly its own pixels for whoever first looks, by a CPU lock or by
// the GPU through a new image: never a frame an earlier swap left in the
// buffer. The swap neither uses nor changes the caller's framebuffer and
// scissor.
TEST_P(SwapTest, FramesHoldTheirOwnPixelsWhenFirstSeen) {
    const SwapCase& c = GetParam();
    constexpr int W = 96, H = 64;
    android::GraphicBufferTestSeam::allowSharedStorage(c.sharedStorage);
    sp<android::IGraphicBufferProducer> producer;
    sp<android::IGraphicBufferConsumer> queue;
    android::BufferQueue::createBufferQueue(&producer, &queue);
    queue->setDefaultBufferSize(W, H);
    sp<android::BufferItemConsumer> consumer =
        new android::BufferItemConsumer(queue, GraphicBuffer::USAGE_SW_READ_OFTEN);
    sp<android::Surface> window = new android::Surface(producer);
    ASSERT_EQ(native_window_set_usage(window.get(), c.usage), 0);
    sp<EglWindowSurface> surface =
        new EglWindowSurface(mGl->env(), window, EglWindowSurface::SURFACE_PREVIEW);
    ASSERT_EQ(surface->initialize(), 0);
    ASSERT_EQ(surface->bindSurface(), 0);
    GlTarget own;
    ASSERT_TRUE(GlTest_makeTarget(4, 4, &own));
    glEnable(GL_SCISSOR_TEST);
    const EGLDisplay display = mGl->env()->getEGLDisplay();
    for (int k = 0; k < 7; ++k) {
        SCOPED_TRACE(k);
        const std::vector<uint8_t> colour = frameColour(k);
        glBindFramebuffer(GL_FRAMEBUFFER, 0);
        glScissor(0, 0, W, H);
        glClearColor(colour[0] / 255.0f, colour[1] / 255.0f, colour[2] / 255.0f, 1.0f);
        glClear(GL_COLOR_BUFFER_BIT);
        glBindFramebuffer(GL_FRAMEBUFFER, own.framebuffer);
        glScissor(1, 1, 1, 1);
        ASSERT_EQ(surface->swapSurface(), 0);
        GLint bound = 0;
        glGetIntegerv(GL_FRAMEBUFFER_BINDING, &bound);
        EXPECT_EQ(std::make_pair(GLuint(bound), GLboolean(GL_TRUE)),
                  std::make_pair(own.framebuffer, glIsEnabled(GL_SCISSOR_TEST)));
        android::BufferItem item;
        ASSERT_EQ(consumer->acquireBuffer(&item, 0), android::NO_ERROR);
        const sp<GraphicBuffer>& frame = item.mGraphicBuffer;
        EXPECT_EQ(frame->hasGpuWrite(), c.queuedWhileDrawn);
        if (k % 2 == 1) {
            const std::vector<uint8_t> seen = GlTest_bufferPixels(display, frame);
            ASSERT_EQ(seen.size(), size_t(W * H * 4));
            EXPECT_TRUE(solid(seen.data(), W, H, W, colour));
        }
        void* pixels = nullptr;
        ASSERT_EQ(frame->lock(GraphicBuffer::USAGE_SW_READ_OFTEN, &pixels), android::NO_ERROR);
        EXPECT_FALSE(frame->hasGpuWrite());
        EXPECT_TRUE(solid(static_cast<uint8_t*>(pixels), W, H, (int)frame->getStride(), colour));
        frame->unlock();
        ASSERT_EQ(consumer->releaseBuffer(item), android::NO_ERROR);
    }
    glDisable(GL_SCISSOR_TEST);
    GlTest_deleteTarget(&own);
    ASSERT_EQ(mGl->surface()->bindSurface(), 0);
    surface->release();
}

INSTANTIATE_TEST_SUITE_P(Buffers, SwapTest, ::testing::ValuesIn(kSwapCases),
                         [](const ::testing::TestParamInfo<SwapCase>& info) {
                             return std::string(info.param.name);
                         });

// A frame drawn by the GPU is ready once its draw is over, after it was
// queued; a frame the CPU wrote is ready when queued. Frames can be taken
// before they are ready: the window waits. Going away with draws in flight
// and frames unread leaves nothing behind (the fixture counts GL objects;
// the sanitizers, memory, fences' threads and races).
TEST_F(GlContextTest, HostWindowNotesWhenEachFrameIsReady) {
    for (const bool gpu : {true, false}) {
        SCOPED_TRACE(gpu);
        sp<HostWindow> window = new HostWindow(64, 48);
        if (!gpu) native_window_set_usage(window.get(), GraphicBuffer::USAGE_SW_READ_OFTEN);
        sp<EglWindowSurface> surface =
            new EglWindowSurface(mGl->env(), window, EglWindowSurface::SURFACE_PREVIEW);
        ASSERT_EQ(surface->initialize(), 0);
        ASSERT_EQ(surface->bindSurface(), 0);
        int64_t lastReady = 0;
        for (int k = 0; k < 5; ++k) {
            GlTest_fillHalves(64, 48);
            ASSERT_EQ(surface->swapSurface(), 0);
            if (k >= 3) continue;  // left in flight, unread
            sp<GraphicBuffer> frame;
            int64_t queuedAt = 0, readyAt = 0;
            ASSERT_EQ(window->acquireFrame(&frame, nullptr, &queuedAt, &readyAt),
                      android::NO_ERROR);
            EXPECT_FALSE(frame->hasGpuWrite());  // waited for by the window
            if (gpu) {
                EXPECT_GT(readyAt, queuedAt);
            } else {
                EXPECT_EQ(readyAt, queuedAt);
            }
            EXPECT_GT(readyAt, lastReady);
            lastReady = readyAt;
            ASSERT_NO_FATAL_FAILURE(expectHalves(frame, 64, 48));
            window->releaseFrame(frame);
        }
        ASSERT_EQ(mGl->surface()->bindSurface(), 0);
        surface->release();
    }
}

}  // namespace
