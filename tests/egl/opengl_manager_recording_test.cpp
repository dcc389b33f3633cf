// Recording in the render manager on real GL: the encoder's input is the
// host video encoder, whose MP4 is decoded back here and compared with the
// effect computed on the CPU over each camera frame; frame selection and
// its interval clock run on a clock the test moves.
// kiv-test-labels: threads
#include <gtest/gtest.h>

#include <memory>

#include <gui/BufferItemConsumer.h>
#include <gui/BufferQueue.h>

#include "core/KivImaging.h"
#include "host/media/VideoEncoderTestSeam.h"
#include "kivhost/VideoEncoder.h"
#include "kivhost/VirtualCamera.h"
#include "kivimaging/OpenGLManager.h"
#include "support/camera_frames.h"
#include "support/eventually.h"
#include "support/gl_fault.h"
#include "support/live_preview.h"
#include "support/log_capture.h"
#include "support/look_reference.h"
#include "support/manual_clock.h"
#include "support/temp_dir.h"
#include "support/video_files.h"
#include "vccore/vc_log.h"

namespace {

const int kW = 64, kH = 48;
const int kSepia = 401;
// What 4:2:0 and libx264 (crf 20) keep of an effect frame, as PSNR of the
// colour channels against the CPU's effect: the chroma of each 2x2 block is
// one sample, so the bars' coloured edges cost most.
const double kMinPsnr = 28.0;

using kivhost::VideoEncoder;

class RecordingTest : public ::testing::Test {
public:
    void start(LivePreview& live) {
        ASSERT_TRUE(live.start(true));
        ASSERT_TRUE(clock.waitForWaitsBegun(1));
    }
    // One frame period: the camera queues its next frame, the clock moves
    // `ms` and the render thread goes round once more; then the encoder has
    // taken every frame recorded (so the render thread never waits for it).
    void step(LivePreview& live, int ms = 41) {
        const size_t waits = clock.waitsBegun();
        ASSERT_EQ(live.camera[0]->queueFrame(), 0);
        clock.advanceMs(ms);
        ASSERT_TRUE(clock.waitForWaitsBegun(waits + 1));
        if (encoder != nullptr) {
            ASSERT_TRUE(eventually(
                [&] { return kivhost::VideoEncoderTestSeam::taken(*encoder) >= recorded(); }));
        }
    }
    // Stopping asks the render thread for a frame at once (no camera frame
    // is needed): wait until it has drawn it and waits again.
    void stopRecording(LivePreview& live) {
        const size_t waits = clock.waitsBegun();
        ASSERT_EQ(live.manager->setRecordingSurface(nullptr), 0);
        ASSERT_TRUE(clock.waitForWaitsBegun(waits + 1));
    }
    std::unique_ptr<VideoEncoder> makeEncoder(int width, int height, const std::string& name) {
        kivhost::VideoEncoderSettings settings;
        settings.width = width;
        settings.height = height;
        settings.threads = 1;
        settings.backlog = 256;
        return VideoEncoder::open(dir.file(name), settings);
    }
    void openEncoder(int width = kW, int height = kH) {
        encoder = makeEncoder(width, height, "rec.mp4");
        ASSERT_NE(encoder, nullptr);
    }
    // Frames the manager queued into the encoder.
    uint64_t recorded() { return encoder != nullptr ? encoder->stats().queued : 0; }
    DecodedVideo closeAndDecode() {
        DecodedVideo video;
        EXPECT_EQ(encoder->close(), 0);
        EXPECT_TRUE(VideoFiles_decode(encoder->path(), &video));
        return video;
    }

    LogCapture log;
    ManualClock clock;
    kivtest::TempDir dir;
    std::unique_ptr<VideoEncoder> encoder;
};

// Every frame is recorded by default, in both drawing modes, and each
// recorded frame is the effect over the camera frame of its render.
class RecordingModeTest : public RecordingTest,
                          public ::testing::WithParamInterface<OpenGLManagerMode> {};

TEST_P(RecordingModeTest, EveryFrameIsRecordedAsTheEffectOverItsCameraFrame) {
    LivePreviewSetup setup;
    setup.mode = GetParam();
    LivePreview live(setup);
    LivePreviewEffect sepia(kSepia);
    live.manager->setFilter(&sepia.imaging);
    ASSERT_NO_FATAL_FAILURE(start(live));
    ASSERT_NO_FATAL_FAILURE(openEncoder());
    ASSERT_EQ(live.manager->setRecordingSurface(encoder->getProducer()), 0);
    // The GL side is built on the next frame (camera frame 1), which is not
    // recorded; frames 2 to 7 are.
    ASSERT_NO_FATAL_FAILURE(step(live));
    EXPECT_EQ(recorded(), 0u);
    for (int i = 0; i < 6; ++i) ASSERT_NO_FATAL_FAILURE(step(live));
    EXPECT_EQ(recorded(), 6u);
    ASSERT_NO_FATAL_FAILURE(stopRecording(live));
    ASSERT_NO_FATAL_FAILURE(step(live));
    ASSERT_NO_FATAL_FAILURE(step(live));
    EXPECT_EQ(recorded(), 6u);
    // The preview went on all along, showing the newest frame.
    const std::vector<uint8_t> shown = live.latestFrame();
    ASSERT_FALSE(shown.empty());
    lookref::expectLook(kSepia, lookref::Picture(kW, kH, CameraFrames_rgba(9, kW, kH)),
                        shown.data(), "preview after recording");
    live.release();

    const DecodedVideo video = closeAndDecode();
    ASSERT_EQ(video.rgba.size(), 6u);
    for (int i = 0; i < 6; ++i) {
        const lookref::Picture camera(kW, kH, CameraFrames_rgba(i + 2, kW, kH));
        const std::vector<uint8_t> expected = lookref::render(kSepia, camera, nullptr);
        EXPECT_GE(VideoFiles_psnr(video.rgba[i], expected, 4), kMinPsnr) << "recorded frame " << i;
        // Against the neighbouring camera frame it must do worse.
        const lookref::Picture other(kW, kH, CameraFrames_rgba(i + 3, kW, kH));
        EXPECT_GT(VideoFiles_psnr(video.rgba[i], expected, 4),
                  VideoFiles_psnr(video.rgba[i], lookref::render(kSepia, other, nullptr), 4))
            << "recorded frame " << i;
    }
}

INSTANTIATE_TEST_SUITE_P(Modes, RecordingModeTest,
                         ::testing::Values(OPENGL_MANAGER_DIRECT, OPENGL_MANAGER_INTERMEDIATE));

TEST_F(RecordingTest, MotionRecordsOneFrameForEachRequestThenNone) {
    LivePreview live;
    ASSERT_NO_FATAL_FAILURE(start(live));
    ASSERT_NO_FATAL_FAILURE(openEncoder());
    for (int i = 0; i < 3; ++i) live.manager->setRecordingMotion(1);
    ASSERT_EQ(live.manager->setRecordingSurface(encoder->getProducer()), 0);
    for (int i = 0; i < 8; ++i) ASSERT_NO_FATAL_FAILURE(step(live));
    EXPECT_EQ(recorded(), 3u);
    // Another request records one more; zero cancels what is pending.
    live.manager->setRecordingMotion(1);
    ASSERT_NO_FATAL_FAILURE(step(live));
    EXPECT_EQ(recorded(), 4u);
    live.manager->setRecordingMotion(1);
    live.manager->setRecordingMotion(0);
    ASSERT_NO_FATAL_FAILURE(step(live));
    EXPECT_EQ(recorded(), 4u);
    live.release();
    const DecodedVideo video = closeAndDecode();
    ASSERT_EQ(video.rgba.size(), 4u);
    // Frames 2, 3 and 4 (the first after the GL side was built), then 9.
    const int64_t frames[] = {2, 3, 4, 9};
    for (int i = 0; i < 4; ++i) {
        EXPECT_EQ(LivePreview_frameNumber(video.rgba[i]), frames[i]);
    }
}

TEST_F(RecordingTest, AnIntervalFrameComesOnlyAfterMoreThanTheInterval) {
    LivePreview live;
    ASSERT_NO_FATAL_FAILURE(start(live));
    ASSERT_NO_FATAL_FAILURE(openEncoder());
    live.manager->setRecordingInterval(1000);
    ASSERT_EQ(live.manager->setRecordingSurface(encoder->getProducer()), 0);
    ASSERT_NO_FATAL_FAILURE(step(live));  // built at t0: the interval starts here
    for (int i = 0; i < 23; ++i) ASSERT_NO_FATAL_FAILURE(step(live));
    EXPECT_EQ(recorded(), 0u);  // t0 + 943
    // A period overslept by 16 ms: this frame is exactly 1000 ms after t0.
    ASSERT_NO_FATAL_FAILURE(step(live, 57));
    EXPECT_EQ(recorded(), 0u);
    EXPECT_EQ(log.count("EGL: interval recording"), 0u);
    ASSERT_NO_FATAL_FAILURE(step(live, 25));  // t0 + 1025
    EXPECT_EQ(recorded(), 1u);
    EXPECT_EQ(log.count("EGL: interval recording"), 1u);
    // The next one counts from there.
    for (int i = 0; i < 24; ++i) ASSERT_NO_FATAL_FAILURE(step(live));
    EXPECT_EQ(recorded(), 1u);  // t0 + 1025 + 984
    ASSERT_NO_FATAL_FAILURE(step(live));
    EXPECT_EQ(recorded(), 2u);
    live.release();
}

TEST_F(RecordingTest, ANewProducerWhileRecordingTakesOverOnTheNextFrame) {
    LivePreview live;
    ASSERT_NO_FATAL_FAILURE(start(live));
    ASSERT_NO_FATAL_FAILURE(openEncoder());
    std::unique_ptr<VideoEncoder> second = makeEncoder(kW, kH, "second.mp4");
    ASSERT_NE(second, nullptr);
    ASSERT_EQ(live.manager->setRecordingSurface(encoder->getProducer()), 0);
    ASSERT_NO_FATAL_FAILURE(step(live));
    ASSERT_NO_FATAL_FAILURE(step(live));
    ASSERT_EQ(live.manager->setRecordingSurface(second->getProducer()), 0);
    ASSERT_NO_FATAL_FAILURE(step(live));  // the first one's surface goes, the second's is built
    ASSERT_NO_FATAL_FAILURE(step(live));
    ASSERT_NO_FATAL_FAILURE(step(live));
    EXPECT_EQ(recorded(), 1u);
    EXPECT_EQ(second->stats().queued, 2u);
    live.release();
    const DecodedVideo first = closeAndDecode();
    ASSERT_EQ(first.rgba.size(), 1u);
    EXPECT_EQ(LivePreview_frameNumber(first.rgba[0]), 2);
    ASSERT_EQ(second->close(), 0);
    DecodedVideo video;
    ASSERT_TRUE(VideoFiles_decode(second->path(), &video));
    ASSERT_EQ(video.rgba.size(), 2u);
    EXPECT_EQ(LivePreview_frameNumber(video.rgba[0]), 4);
}

// A recording that fails ends, its GL side goes the frame after, the
// preview goes on, and recording again into a new encoder works.
enum Ending { ENCODER_CLOSED, MAKE_CURRENT_FAILED, SWAP_FAILED };

class RecordingEndTest : public RecordingTest, public ::testing::WithParamInterface<Ending> {};

TEST_P(RecordingEndTest, TheRecordingEndsAndThePreviewGoesOn) {
    LivePreview live;
    ASSERT_NO_FATAL_FAILURE(start(live));
    // A size of its own, so that its surface is the one a fault can pick.
    const int w = kW / 2, h = kH / 2;
    android::sp<android::IGraphicBufferProducer> target;
    android::sp<android::BufferItemConsumer> stuck;
    if (GetParam() == SWAP_FAILED) {
        // A consumer that takes nothing and a producer that may not wait:
        // once the queue's three slots hold frames, a swap finds no buffer.
        android::sp<android::IGraphicBufferConsumer> consumer;
        android::BufferQueue::createBufferQueue(&target, &consumer);
        consumer->setDefaultBufferSize(w, h);
        ASSERT_EQ(target->setDequeueTimeout(0), android::NO_ERROR);
        stuck = new android::BufferItemConsumer(consumer, 0);
    } else {
        ASSERT_NO_FATAL_FAILURE(openEncoder(w, h));
        target = encoder->getProducer();
    }
    auto queued = [&] { return stuck != nullptr ? stuck->getQueueStats().queued : recorded(); };
    ASSERT_EQ(live.manager->setRecordingSurface(target), 0);
    for (int i = 0; i < 4; ++i) ASSERT_NO_FATAL_FAILURE(step(live));
    ASSERT_EQ(queued(), 3u);
    log.clear();
    if (GetParam() == ENCODER_CLOSED) {
        EXPECT_EQ(encoder->close(), 0);
    } else if (GetParam() == MAKE_CURRENT_FAILED) {
        GlFault_failMakeCurrents(1, w, h);
    }
    const uint64_t shown = live.framesShown();
    ASSERT_NO_FATAL_FAILURE(step(live));  // the recording ends
    ASSERT_NO_FATAL_FAILURE(step(live));  // its GL side goes
    ASSERT_NO_FATAL_FAILURE(step(live));
    GlFault_failMakeCurrents(0);
    if (GetParam() == ENCODER_CLOSED) {
        EXPECT_TRUE(
            log.matches({"W EGL: The recording surface has most likely been deleted "
                         "(NO_INIT). Stopping record."}));
    } else if (GetParam() == SWAP_FAILED) {
        EXPECT_TRUE(log.matches({
            "E EglNativeSeam: no buffer to swap into",
            "E EGL Error: 0x3000 'EGL_SUCCESS' - eglSwapBuffers(display, mEglSurface) at "
            "core/egl/EglWindowSurface:#",
            "E VC_ERROR_UNKNOWN (-1): core/egl/EglWindowSurface:#",
            "E EGL: Call to eglSwapBuffers() failed [recording]",
            "E VC_ERROR_UNKNOWN (-1): core/egl/OpenGLManager:#",
        }));
    } else {
        EXPECT_TRUE(log.matches({
            "E EGL Error: 0x300d 'EGL_BAD_SURFACE' - result = eglMakeCurrent(display, "
            "mEglSurface, mEglSurface, context) at core/egl/EglWindowSurface:#",
            "E VC_ERROR_UNKNOWN (-1): core/egl/EglWindowSurface:#",
            "E EGL: Call to eglMakeCurrent() failed [recording]",
            "E EGL: It looks like the SurfaceTexture was abandonned. Stopping record.",
        }));
    }
    EXPECT_EQ(queued(), 3u);
    EXPECT_EQ(live.framesShown(), shown + 3);
    const std::vector<uint8_t> frame = live.latestFrame();
    ASSERT_FALSE(frame.empty());
    EXPECT_EQ(LivePreview_frameNumber(frame), 7);

    encoder.reset();
    ASSERT_NO_FATAL_FAILURE(openEncoder());
    ASSERT_EQ(live.manager->setRecordingSurface(encoder->getProducer()), 0);
    ASSERT_NO_FATAL_FAILURE(step(live));
    ASSERT_NO_FATAL_FAILURE(step(live));
    EXPECT_EQ(recorded(), 1u);
    live.release();
    DecodedVideo video = closeAndDecode();
    ASSERT_EQ(video.rgba.size(), 1u);
    EXPECT_EQ(LivePreview_frameNumber(video.rgba[0]), 9);
}

INSTANTIATE_TEST_SUITE_P(Endings, RecordingEndTest,
                         ::testing::Values(ENCODER_CLOSED, MAKE_CURRENT_FAILED, SWAP_FAILED));

// Start and stop many times with the pipeline running: nothing leaks (the
// sanitizer builds check) and each recording holds its own frames.
TEST_F(RecordingTest, StartAndStopCycles) {
    const int kCycles = 200;
    LivePreview live;
    ASSERT_NO_FATAL_FAILURE(start(live));
    ASSERT_NO_FATAL_FAILURE(openEncoder());
    for (int i = 0; i < kCycles; ++i) {
        ASSERT_EQ(live.manager->setRecordingSurface(encoder->getProducer()), 0);
        ASSERT_NO_FATAL_FAILURE(step(live));
        ASSERT_NO_FATAL_FAILURE(step(live));
        ASSERT_NO_FATAL_FAILURE(stopRecording(live));
        ASSERT_NO_FATAL_FAILURE(step(live));
    }
    EXPECT_EQ(recorded(), (uint64_t)kCycles);
    live.release();
    EXPECT_EQ(encoder->close(), 0);
    EXPECT_EQ(encoder->stats().encoded, (uint64_t)kCycles);
}

// The lines and statuses of recording, in order.
TEST_F(RecordingTest, LogLinesAndStatuses) {
    LivePreviewSetup setup;
    setup.mode = OPENGL_MANAGER_INTERMEDIATE;
    setup.width = 1080;
    setup.height = 1440;
    LivePreview live(setup);
    ASSERT_NO_FATAL_FAILURE(openEncoder(1080, 1440));
    // No program before the render thread has drawn.
    EXPECT_EQ(live.manager->setRecordingSurface(encoder->getProducer()), VC_ERROR_INVALID_STATE);
    EXPECT_TRUE(log.matches({
        "D EGL: Called setRecordingSurface: *",
        "E EGL: Can't start recording now: preview window is *",
        "E VC_ERROR_INVALID_STATE (-7): core/egl/OpenGLManager:#",
    }));
    ASSERT_NO_FATAL_FAILURE(start(live));
    // A tall preview: the intermediate image is clamped to 1080 rows.
    EXPECT_EQ(log.count("bool OpenGLManager::initializeRecordingFBO() : 810 x 1080"), 1u);
    log.clear();
    live.manager->setRecordingInterval(-1);
    ASSERT_EQ(live.manager->setRecordingSurface(encoder->getProducer()), 0);
    ASSERT_NO_FATAL_FAILURE(step(live));
    ASSERT_NO_FATAL_FAILURE(step(live));
    EXPECT_EQ(recorded(), 1u);
    ASSERT_NO_FATAL_FAILURE(stopRecording(live));
    ASSERT_EQ(live.manager->setRecordingSurface(nullptr), 0);
    ASSERT_NO_FATAL_FAILURE(step(live));
    EXPECT_TRUE(log.matches({
        "D EGL: setRecordingInterval: -1",
        "D EGL: Called setRecordingSurface: *",
        "D EGL: Recording window is NULL, creating it now.",
        "D EGL: Recording window size: 1080x1440",
        "D EGL: Updated window geometry 0x0 --> 1080x1440 [*",
        "D bool OpenGLManager::initializeRecordingFBO() : 810 x 1080",
        "D EGL: Successfully created surface for recording!",
        "D EGL: Called setRecordingSurface: (nil)",
        "D EGL: Stopping recording now. Releasing recording surface and stuff.",
        "D EGL: Called setRecordingSurface: (nil)",
    }));
    live.release();
}

}  // namespace
