// Camera source windows on real GL, fed by the virtual camera one frame at a
// time, with the timing rules on a clock the test moves: what is latched
// (number and colours against the image core's conversion), when the latch
// drains the queue to catch up, the first-frame wait, the three kinds, and
// that nothing outlives a thousand windows.
// kiv-test-labels: threads
#include "core/egl/EglWindow.h"

#include <gtest/gtest.h>
#include <gui/BufferItemConsumer.h>
#include <gui/HostWindow.h>

#include <functional>
#include <memory>
#include <thread>

#include "kivhost/VirtualCamera.h"
#include "support/camera_frames.h"
#include "support/eventually.h"
#include "support/gl_context.h"
#include "support/image_ptr.h"
#include "support/log_capture.h"
#include "support/manual_clock.h"
#include "support/open_files.h"
#include "support/trace_capture.h"

using namespace android;
using kivhost::VirtualCamera;

namespace {

const nsecs_t kMs = 1000000;

// A kind-0 window at w x h with a generator camera connected to it.
class CameraWindowTest : public GlContextTest {
protected:
    void open(int w, int h) {
        mWindow = new EglWindow(0, w, h);
        ASSERT_EQ(mWindow->initialize(), 0);
        mCamera.reset(new VirtualCamera(kivhost::VirtualCamera_generator(w, h), w, h));
        ASSERT_EQ(mCamera->connect(mWindow->getANativeWindow()), 0);
        mDrawer.reset(new ExternalTextureDrawer(w, h));
        ASSERT_TRUE(mDrawer->ok());
        mW = w;
        mH = h;
    }
    void TearDown() override {
        mDrawer.reset();
        if (mCamera != nullptr) mCamera->disconnect();
        if (mWindow != nullptr) mWindow->release();
        GlContextTest::TearDown();
    }
    // The frame index the window's texture shows now.
    int64_t shown() {
        std::vector<uint8_t> pixels = mDrawer->draw(mWindow->getTexture());
        return kivhost::VirtualCamera_decodeFrameNumber(pixels.data(), mW, mH, false);
    }
    // One render of a steady 41 ms loop: a camera frame (unless not), then the latch.
    void render(bool frame = true) {
        mClock.advance(41 * kMs);
        if (frame) mCamera->queueFrame();
        ASSERT_EQ(mWindow->updateTexImage(), 0);
    }
    ManualClock mClock;
    sp<EglWindow> mWindow;
    std::unique_ptr<VirtualCamera> mCamera;
    std::unique_ptr<ExternalTextureDrawer> mDrawer;
    int mW = 0, mH = 0;
};

class LatchSizeTest : public CameraWindowTest,
                      public ::testing::WithParamInterface<std::pair<int, int>> {};

TEST_P(LatchSizeTest, EachLatchedFrameShowsItsNumberAndColours) {
    const int w = GetParam().first, h = GetParam().second;
    ASSERT_NO_FATAL_FAILURE(open(w, h));
    for (uint64_t i = 0; i < 3; ++i) {
        ASSERT_EQ(mCamera->queueFrame(), 0);
        mClock.advance(33 * kMs);
        ASSERT_EQ(mWindow->updateTexImage(), 0);
        std::vector<uint8_t> pixels = mDrawer->draw(mWindow->getTexture());
        // The texture samples the frame as the image core converts it; one
        // step of GPU rounding at most.
        EXPECT_LE(VCImageTest_maxDifference(pixels, CameraFrames_rgba(i, w, h)), 1)
            << "frame " << i;
        EXPECT_EQ(kivhost::VirtualCamera_decodeFrameNumber(pixels.data(), w, h, false), (int64_t)i);
    }
    EXPECT_EQ(mCamera->framesQueued(), 3u);
    // Twice: the first copy gives the buffer's lock back.
    for (int k = 0; k < 2; ++k) {
        ImagePtr copy(mWindow->getImageData());
        ASSERT_NE(copy, nullptr) << k;
        EXPECT_EQ(VCImageTest_bytes(*copy), CameraFrames_nv21(2, w, h));
    }
}

INSTANTIATE_TEST_SUITE_P(Sizes, LatchSizeTest,
                         ::testing::Values(std::make_pair(64, 48), std::make_pair(176, 144),
                                           std::make_pair(330, 186)));

TEST_F(CameraWindowTest, ALateLatchDrainsToTheNewestFrameNeverAnOlderOne) {
    ASSERT_NO_FATAL_FAILURE(open(64, 48));
    render();
    EXPECT_EQ(shown(), 0);
    ASSERT_EQ(mCamera->queueFrame(), 0);
    ASSERT_EQ(mCamera->queueFrame(), 0);
    EXPECT_EQ(mCamera->queueFrame(), WOULD_BLOCK);  // two queued, one latched: no buffer left
    mClock.advance(61 * kMs);
    TraceCapture trace;
    ASSERT_EQ(mWindow->updateTexImage(), 0);
    EXPECT_EQ(trace.count("KI-updateTexImage[0]-delay"), 1u);
    EXPECT_EQ(shown(), 2);
    // On time, the oldest queued frame is latched.
    mCamera->queueFrame();
    mCamera->queueFrame();
    mClock.advance(41 * kMs);
    ASSERT_EQ(mWindow->updateTexImage(), 0);
    EXPECT_EQ(shown(), 3);
    EXPECT_EQ(trace.count("KI-updateTexImage[0]"), 1u);
    EXPECT_EQ(mCamera->framesNotQueued(), 1u);
}

TEST_F(CameraWindowTest, AGapBetweenLatchesAddsOneDrainPerStarted200Ms) {
    ASSERT_NO_FATAL_FAILURE(open(64, 48));
    const struct {
        nsecs_t gap;
        size_t drains;
    } cases[] = {{60 * kMs, 0}, {60 * kMs + 1, 1}, {199 * kMs, 1}, {200 * kMs, 2}, {400 * kMs, 3}};
    for (const auto& c : cases) {
        render();
        TraceCapture trace;
        mClock.advance(c.gap);
        ASSERT_EQ(mWindow->updateTexImage(), 0);
        // Enough for the debt to run out; no camera frames, so no late-frame
        // debt mixes in.
        for (int i = 0; i < 9; ++i) render(false);
        EXPECT_EQ(trace.count("KI-updateTexImage[0]-delay"), c.drains) << c.gap << " ns";
        EXPECT_EQ(trace.count("KI-updateTexImage[0]") + c.drains, 10u);
    }
}

TEST_F(CameraWindowTest, TwentyFourLateFramesSetADebtOfAtLeastFour) {
    ASSERT_NO_FATAL_FAILURE(open(64, 48));
    const struct {
        int64_t blockMs;
        size_t drains;
    } cases[] = {{984, 0}, {985, 4}, {984 + 41 * 3, 4}, {984 + 41 * 5, 6}, {984 + 41 * 5 + 40, 6}};
    for (const auto& c : cases) {
        TraceCapture trace;
        // 24 frames spread over the block, each latched as it comes (gaps
        // under 60 ms add no debt of their own).
        nsecs_t at = 0;
        for (int frame = 0; frame < 24; ++frame) {
            const nsecs_t due = c.blockMs * kMs * frame / 23;
            mClock.advance(due - at);
            at = due;
            ASSERT_EQ(mCamera->queueFrame(), 0);
            ASSERT_EQ(mWindow->updateTexImage(), 0);
        }
        for (int i = 0; i < 12; ++i) render(false);  // blocks stay 24 frames apart
        EXPECT_EQ(trace.count("KI-updateTexImage[0]-delay"), c.drains) << c.blockMs << " ms";
        // The next block starts clean.
        mClock.advance(41 * kMs);
    }
}

TEST_F(CameraWindowTest, AFlushDrainsEverySecondRenderFor48Renders) {
    ASSERT_NO_FATAL_FAILURE(open(64, 48));
    render();
    TraceCapture trace;
    mWindow->flushTexImage();
    for (int i = 0; i < 48; ++i) render();
    EXPECT_EQ(trace.count("KI-updateTexImage[0]-delay"), 24u);
    EXPECT_EQ(trace.count("KI-updateTexImage[0]"), 24u);
    trace.clear();
    for (int i = 0; i < 4; ++i) render();
    EXPECT_EQ(trace.count("KI-updateTexImage[0]-delay"), 0u);
}

TEST_F(CameraWindowTest, TheFirstFrameWaitEndsOnARequestIssuedDuringItOnly) {
    ASSERT_NO_FATAL_FAILURE(open(64, 48));
    TraceCapture trace;
    // During the wait: the latch goes on without a frame.
    std::thread client([&] {
        ASSERT_TRUE(mClock.waitForWaiters(1));
        mWindow->requestRender();
    });
    ASSERT_EQ(mWindow->updateTexImage(0), 0);
    client.join();
    EXPECT_EQ(trace.count("KI-updateTexImage[0]-wait"), 1u);
    EXPECT_EQ(shown(), -1);  // nothing latched yet

    // Before the wait: cleared, so only the camera's first frame ends it.
    mWindow->requestRender();
    std::thread camera([&] {
        ASSERT_TRUE(mClock.waitForWaiters(1));
        EXPECT_EQ(mCamera->queueFrame(), 0);
    });
    LogCapture log;
    ASSERT_EQ(mWindow->updateTexImage(0), 0);
    camera.join();
    EXPECT_EQ(shown(), 0);
    EXPECT_TRUE(log.contains(VF_LOG_INFO, "EGL: Framewaiter #0, 1st frame"));
    // Once a frame came, neither form waits.
    ASSERT_EQ(mWindow->updateTexImage(0), 0);
    ASSERT_EQ(mWindow->updateTexImage(1), 0);
    EXPECT_EQ(trace.count("KI-updateTexImage[0]"), 1u);
    EXPECT_EQ(mClock.waiters(), 0u);
}

TEST_F(GlContextTest, AClientConsumerWindowLatchesTheNewestAndSays256WithoutANewFrame) {
    ManualClock clock;
    sp<IGraphicBufferProducer> producer;
    sp<IGraphicBufferConsumer> raw;
    BufferQueue::createBufferQueue(&producer, &raw);
    GLuint first = 0;
    glGenTextures(1, &first);
    sp<GLConsumer> consumer = new GLConsumer(raw, first, GL_TEXTURE_EXTERNAL_OES, true, false);
    sp<EglWindow> window = new EglWindow(0, consumer, producer, 64, 48);
    ASSERT_EQ(window->initialize(), 0);  // detaches: the texture is gone
    EXPECT_FALSE(glIsTexture(first));
    EXPECT_EQ(consumer->updateTexImage(), INVALID_OPERATION);
    ASSERT_EQ(window->rebindingTexImage(), 0);
    EXPECT_EQ(window->rebindingTexImage(), VC_ERROR_UNKNOWN);  // attached already
    sp<Surface> surface = new Surface(producer);
    VirtualCamera camera(kivhost::VirtualCamera_generator(64, 48), 64, 48);
    ASSERT_EQ(camera.connect(surface), 0);
    ASSERT_EQ(
        native_window_set_buffers_sticky_transform(surface.get(), NATIVE_WINDOW_TRANSFORM_ROT_90),
        0);
    ExternalTextureDrawer drawer(64, 48);
    EXPECT_EQ(window->updateTexImage(), EglWindow::kNoNewFrame);
    camera.queueFrame();
    camera.queueFrame();
    EXPECT_EQ(window->updateTexImage(), 0);
    std::vector<uint8_t> pixels = drawer.draw(window->getTexture());
    EXPECT_EQ(kivhost::VirtualCamera_decodeFrameNumber(pixels.data(), 64, 48, false), 1);
    EXPECT_EQ(window->updateTexImage(), EglWindow::kNoNewFrame);
    EXPECT_EQ(window->getCurrentTransform(), (uint32_t)NATIVE_WINDOW_TRANSFORM_ROT_90);
    camera.disconnect();
    window->release();
    consumer->abandon();
}

TEST_F(GlContextTest, AnOutputWindowWorksUntilItsConsumerIsGoneAndNeverLatches) {
    sp<IGraphicBufferProducer> producer;
    sp<IGraphicBufferConsumer> raw;
    BufferQueue::createBufferQueue(&producer, &raw);
    sp<BufferItemConsumer> encoder =
        new BufferItemConsumer(raw, GraphicBuffer::USAGE_HW_VIDEO_ENCODER);
    sp<EglWindow> window = new EglWindow(producer, 32, 16);
    ASSERT_EQ(window->initialize(), 0);
    EXPECT_EQ(window->getId(), -1);
    EXPECT_NE(window->getANativeWindow(), nullptr);
    EXPECT_TRUE(window->checkSurfaceWorking());
    EXPECT_EQ(window->getCurrentTransform(), 0u);
    encoder.clear();  // the encoder goes away
    EXPECT_FALSE(window->checkSurfaceWorking());
    window->release();
    EXPECT_FALSE(window->checkSurfaceWorking());
}

TEST_F(GlContextTest, LogLinesAndStatusCodes) {
    ManualClock clock;
    LogCapture log;
    sp<IGraphicBufferProducer> producer;
    BufferQueue::createBufferQueue(&producer, nullptr);
    sp<EglWindow> output = new EglWindow(producer, 8, 8);
    sp<EglWindow> bad = new EglWindow(0, -2, 4);
    sp<EglWindow> unused = new EglWindow(1, 8, 8);
    sp<EglWindow> empty = new EglWindow(0, 8, 8);
    ASSERT_EQ(empty->initialize(), 0);
    const struct {
        std::function<int()> call;
        int status;
        std::string line;
    } cases[] = {
        {[&] { return output->updateTexImage(); }, VC_ERROR_UNSUPPORTED,
         "VC_ERROR_UNSUPPORTED (-6): core/egl/EglWindow:"},
        {[&] { return output->updateTexImage(1); }, VC_ERROR_UNSUPPORTED,
         "VC_ERROR_UNSUPPORTED (-6): core/egl/EglWindow:"},
        {[&] { return bad->initialize(); }, VC_ERROR_UNKNOWN,
         "EGL Error: int EglWindow::initANativeWindow():"},
        {[&] { return unused->updateTexImage(); }, VC_ERROR_INVALID_STATE, "EGL: not initialized"},
        {[&] { return unused->getImageData() == nullptr ? -100 : 0; }, -100,
         "EGL: not initialized"},
        {[&] { return empty->getImageData() == nullptr ? -100 : 0; }, -100,
         "Failed to get the current buffer"},
    };
    for (const auto& c : cases) {
        log.clear();
        EXPECT_EQ(c.call(), c.status) << c.line;
        ASSERT_FALSE(log.texts().empty()) << c.line;
        EXPECT_EQ(log.texts()[0].rfind(c.line, 0), 0u) << log.texts()[0];
        EXPECT_EQ(log.lines()[0].level, VF_LOG_ERROR);
    }
    bad->release();
    empty->release();
}

TEST_F(GlContextTest, AThousandWindowsLeaveNoGlObjectOrMemoryFileBehind) {
    auto cycle = [&] {
        sp<EglWindow> window = new EglWindow(0, 64, 48);
        ASSERT_EQ(window->initialize(), 0);
        VirtualCamera camera(kivhost::VirtualCamera_generator(64, 48), 64, 48);
        ASSERT_EQ(camera.connect(window->getANativeWindow()), 0);
        ASSERT_EQ(camera.queueFrame(), 0);
        ASSERT_EQ(window->updateTexImage(0), 0);
        window->release();
        EXPECT_EQ(camera.queueFrame(), NO_INIT);  // the consumer is gone with the window
    };
    for (int i = 0; i < 3; ++i) ASSERT_NO_FATAL_FAILURE(cycle());  // pools fill up
    const int files = Test_openFiles();  // GL objects: the fixture counts them
    for (int i = 0; i < 1000; ++i) ASSERT_NO_FATAL_FAILURE(cycle());
    EXPECT_EQ(Test_openFiles(), files);
}

// The camera on its thread (with the frame-available callbacks), the latch
// here, and a client asking for renders and flushes: every latched frame is
// a whole generated frame, never an older one than before.
TEST_F(CameraWindowTest, CameraCallbacksLatchAndClientRunOnThreeThreads) {
    ASSERT_NO_FATAL_FAILURE(open(64, 48));
    ASSERT_EQ(mCamera->start(500), 0);
    std::atomic<bool> done{false};
    std::thread client([&] {
        while (!done) {
            mWindow->requestRender();
            mWindow->flushTexImage();
            std::this_thread::yield();
        }
    });
    int64_t last = -1;
    ASSERT_EQ(mWindow->updateTexImage(0), 0);
    // The camera keeps real time: on a loaded machine its first frame may
    // come after the 200 latches, so they start once it has come.
    EXPECT_TRUE(eventually([&] { return mCamera->framesQueued() > 0; }));
    for (int i = 0; i < 200; ++i) {
        mClock.advance(41 * kMs);
        ASSERT_EQ(mWindow->updateTexImage(), 0);
        const int64_t now = shown();
        ASSERT_GE(now, last);
        last = now;
    }
    done = true;
    client.join();
    mCamera->stop();
    EXPECT_GE(last, 0);
    EXPECT_GT(mCamera->framesQueued(), 0u);
}

}  // namespace
