// Still output of the render manager on real GL: pictures handed over by the
// client, snapshots and screenshots of the rendered effect, and the dual-shot
// stills, each received by a listener and compared with the effect computed
// on the CPU; failed captures are reported once and leave the preview running.
// kiv-test-labels: threads
#include <gtest/gtest.h>

#include "core/KivImaging.h"
#include "core/filters/sce/singleCameraEffects.h"
#include "kivimaging/OpenGLManager.h"
#include "support/camera_frames.h"
#include "support/frame_collector.h"
#include "support/gl_fault.h"
#include "support/image_ptr.h"
#include "support/live_preview.h"
#include "support/log_capture.h"
#include "support/look_reference.h"
#include "support/manual_clock.h"
#include "support/trace_capture.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_log.h"

namespace {

const int kW = 64, kH = 48;

// Two-camera look that shows camera 1 alone: what the second texture unit
// holds becomes visible.
class SecondCamera : public SingleCameraEffects {
public:
    // Below the downloadable filters' ids: a built-in kind of effect.
    int getFilterType() const override { return 1999; }
    const char* getFragmentShader() const override {
        return "vec4 doEffect2() { return vec4(texture2D(texSampler2, v_texcoord).rgb, 1.0); }";
    }
};

// A generator frame as a client's NV21 picture (or one without data).
ImagePtr picture(uint64_t index, int w, int h, bool data = true) {
    if (!data) return ImagePtr(VCImage_createEmpty(w, h, VC_FORMAT_NV21));
    const std::vector<uint8_t> nv21 = CameraFrames_nv21(index, w, h);
    ImagePtr image(VCImage_createNew(w, h, VC_FORMAT_NV21));
    std::copy(nv21.begin(), nv21.end(), image->data);
    return image;
}

class PictureTest : public ::testing::Test {
protected:
    // Asks for a capture and runs the frame that serves it; true once the
    // listener has heard of it (a frame or an error).
    bool capture(LivePreview& live, CaptureMode mode) {
        const size_t before = got.frames().size() + got.errors().size();
        live.manager->onTakePicture(mode);
        return live.step(clock) && got.waitFor(before + 1);
    }

    LogCapture log;
    TraceCapture trace;
    ManualClock clock;
    FrameCollector got{VC_FORMAT_RGBA};
};

// Pictures: the effect over the client's picture, at its size, in the
// listener's format.
struct PictureCase {
    int effect;
    uint32_t format;
    int width, height;
};
class ClientPictureTest : public PictureTest, public ::testing::WithParamInterface<PictureCase> {};

TEST_P(ClientPictureTest, IsTheEffectOverThePicture) {
    const PictureCase& c = GetParam();
    FrameCollector listener(c.format);
    LivePreviewEffect effect(c.effect);
    LivePreview live;
    live.manager->setFilter(&effect.imaging);
    live.manager->setOnPictureListener(&listener);
    ASSERT_TRUE(live.startPaced(clock));
    ASSERT_EQ(live.manager->applyToPicture(picture(5, c.width, c.height).release(), nullptr), 0);
    live.manager->onTakePicture(CAPTURE_PICTURE);
    ASSERT_TRUE(live.step(clock));
    ASSERT_TRUE(listener.waitFor(1));
    ASSERT_EQ(listener.frames().size(), 1u);
    const CollectedFrame f = listener.frames()[0];
    EXPECT_EQ(f.format, c.format);
    ASSERT_EQ(f.width, c.width);
    ASSERT_EQ(f.height, c.height);
    const lookref::Picture in(c.width, c.height, CameraFrames_rgba(5, c.width, c.height));
    if (c.format == VC_FORMAT_RGBA) {
        lookref::expectLook(c.effect, in, f.bytes.data(), "picture");
    } else {
        // The reference goes through the same NV21 conversion: its rounding
        // and chroma averaging add a step to the look's tolerance.
        std::vector<uint8_t> want = lookref::render(c.effect, in, nullptr);
        std::vector<uint8_t> nv21(f.bytes.size());
        ImagePtr from = VCImageTest_wrap(want.data(), c.width, c.height, VC_FORMAT_RGBA);
        ImagePtr to = VCImageTest_wrap(nv21.data(), c.width, c.height, VC_FORMAT_NV21);
        ASSERT_EQ(VCImage_convert(from.get(), to.get()), 0);
        EXPECT_LE(VCImageTest_maxDifference(nv21, f.bytes), lookref::tolerance(c.effect) + 1);
    }
    // One capture, and the preview goes on.
    ASSERT_TRUE(live.step(clock));
    EXPECT_EQ(live.framesShown(), 13u);
    EXPECT_EQ(listener.frames().size() + listener.errors().size(), 1u);
    live.release();
    EXPECT_EQ(trace.count("KI-TAKEPICTURE"), 1u);
    EXPECT_EQ(trace.count("KI-TAKEPICTURE_INIT"), 1u);
    EXPECT_EQ(trace.count("KI-applyToPicture"), 1u);
}

INSTANTIATE_TEST_SUITE_P(Cases, ClientPictureTest,
                         ::testing::Values(PictureCase{401, VC_FORMAT_RGBA, 96, 72},
                                           PictureCase{403, VC_FORMAT_NV21, 96, 72},
                                           PictureCase{400, VC_FORMAT_RGBA, 40, 100}));

// Snapshots draw the effect once more at preview size, rows in the GL's
// order (bottom first); screenshots are what the screen shows.
class ScreenCaptureTest : public PictureTest, public ::testing::WithParamInterface<CaptureMode> {};

TEST_P(ScreenCaptureTest, IsTheRenderedEffect) {
    const bool screenshot = GetParam() == CAPTURE_SCREENSHOT;
    LivePreviewEffect sepia(401);
    LivePreview live;
    live.manager->setFilter(&sepia.imaging);
    live.manager->setOnPictureListener(&got);
    ASSERT_TRUE(live.startPaced(clock));
    ASSERT_TRUE(live.step(clock));
    ASSERT_TRUE(capture(live, GetParam()));
    ASSERT_EQ(got.frames().size(), 1u);
    const CollectedFrame f = got.frames()[0];
    ASSERT_EQ(f.width, kW);
    ASSERT_EQ(f.height, kH);
    const std::vector<uint8_t> shown = live.latestFrame();
    // The frame latched for that render: the camera's third.
    ASSERT_EQ(LivePreview_frameNumber(shown), 2);
    lookref::expectLook(401, lookref::Picture(kW, kH, CameraFrames_rgba(2, kW, kH)),
                        screenshot ? f.bytes.data() : LivePreview_flipRows(f.bytes, kW, kH).data(),
                        screenshot ? "screenshot" : "snapshot");
    if (screenshot) {
        EXPECT_EQ(VCImageTest_maxDifference(shown, f.bytes), 0);
    }
    live.release();
    EXPECT_EQ(trace.count(screenshot ? "KI-SCREENSHOT" : "KI-SNAPSHOT"), 1u);
    EXPECT_EQ(trace.count(screenshot ? "KI-SCREENSHOT_INIT" : "KI-SNAPSHOT_INIT"), 1u);
}

INSTANTIATE_TEST_SUITE_P(Modes, ScreenCaptureTest,
                         ::testing::Values(CAPTURE_SNAPSHOT, CAPTURE_SCREENSHOT));

// A snapshot whose framebuffer cannot be read back is read from the screen
// instead; when that fails too, the listener hears of it once, the request is
// not repeated and the preview goes on.
class SnapshotFallbackTest : public PictureTest, public ::testing::WithParamInterface<int> {};

TEST_P(SnapshotFallbackTest, ReadsPixelsThenGivesUp) {
    const int failedReads = GetParam();
    LivePreview live;
    live.manager->setOnPictureListener(&got);
    ASSERT_TRUE(live.startPaced(clock));
    // The snapshot's target reads itself back once before the capture's
    // read-back, as its cache is flushed before the draw (swaps copy their
    // frame on the GPU, without a read-back).
    GlFault_failPictureReads(failedReads, 1);
    ASSERT_TRUE(capture(live, CAPTURE_SNAPSHOT));
    GlFault_failPictureReads(0);
    for (int i = 0; i < 3; ++i) ASSERT_TRUE(live.step(clock));
    EXPECT_EQ(live.framesShown(), 15u);
    EXPECT_EQ(log.count("EGL: Taking a snapshot of the rendered effect"), 1u);
    EXPECT_EQ(log.count("EGL: EglSnapShotLite::takePicture failed [sync] in readAndPost(): -1"),
              1u);
    if (failedReads == 1) {
        ASSERT_EQ(got.frames().size(), 1u);
        EXPECT_LE(
            VCImageTest_maxDifference(LivePreview_flipRows(CameraFrames_rgba(1, kW, kH), kW, kH),
                                      got.frames()[0].bytes),
            1);
        EXPECT_EQ(got.errors().size(), 0u);
    } else {
        EXPECT_EQ(got.frames().size(), 0u);
        ASSERT_EQ(got.errors().size(), 1u);
        EXPECT_EQ(got.errors()[0].code, -1);
        EXPECT_EQ(got.errors()[0].message, "Asynchronous picture failed");
        EXPECT_EQ(log.count("EGL: Asynchronous picture failed: -1"), 1u);
    }
    live.release();
}

INSTANTIATE_TEST_SUITE_P(Reads, SnapshotFallbackTest, ::testing::Values(1, 2));

TEST_F(PictureTest, PicturesStayUntilTheNextAcceptedHandOver) {
    LivePreview live;
    // No render thread yet.
    ImagePtr early = picture(1, kW, kH);
    EXPECT_EQ(live.manager->applyToPicture(early.get(), nullptr), VC_ERROR_INVALID_STATE);
    ASSERT_TRUE(live.startPaced(clock));
    // No listener: refused, the caller keeps its picture.
    ImagePtr refused = picture(2, kW, kH);
    EXPECT_EQ(live.manager->applyToPicture(refused.get(), nullptr), VC_ERROR_INVALID_STATE);
    live.manager->setOnPictureListener(&got);
    ASSERT_EQ(live.manager->applyToPicture(picture(3, kW, kH).release(), nullptr), 0);
    live.manager->setOnPictureListener(nullptr);
    EXPECT_EQ(live.manager->applyToPicture(refused.get(), nullptr), VC_ERROR_INVALID_STATE);
    live.manager->setOnPictureListener(&got);
    // Picture 3 is still held: taken twice.
    ASSERT_TRUE(capture(live, CAPTURE_PICTURE));
    ASSERT_TRUE(capture(live, CAPTURE_PICTURE));
    ASSERT_EQ(got.frames().size(), 2u);
    for (const CollectedFrame& f : got.frames()) {
        EXPECT_EQ(LivePreview_frameNumber(f.bytes), 3);
    }
    live.release();
    EXPECT_EQ(
        log.count("In applyToPicture, OpenGLManager is already stopped! Can not take a picture."),
        1u);
    EXPECT_EQ(log.count("In applyToPicture, no picture listener was set. Aborting."), 2u);
}

TEST_F(PictureTest, RequestWithoutListenerIsDropped) {
    LivePreview live;
    ASSERT_TRUE(live.startPaced(clock));
    live.manager->onTakePicture(CAPTURE_SNAPSHOT);
    ASSERT_TRUE(live.step(clock));
    live.manager->setOnPictureListener(&got);
    ASSERT_TRUE(live.step(clock));
    EXPECT_EQ(got.frames().size() + got.errors().size(), 0u);
    EXPECT_EQ(log.count("In onDrawFrame_TakePicture, no picture listener was set. Aborting."), 1u);
    live.release();
}

// Two cameras: both pictures are needed, and the dual-shot stills stand in
// for the camera they name.
class DualTest : public PictureTest {
protected:
    void SetUp() override {
        LivePreviewSetup setup;
        setup.layout = CAMERA_LAYOUT_DUAL;
        // Camera 1 runs two frames ahead of camera 0.
        setup.firstFrames[1] = 3;
        live.reset(new LivePreview(setup));
        live->manager->setOnPictureListener(&got);
    }
    void TearDown() override { live->release(); }
    // What texture unit `unit` shows on the next frame, through the program's
    // own pass-through (unit 0) or the look that shows the second camera
    // (unit 1). A camera whose still stands in is not latched, so it is not
    // fed either.
    int64_t showing(int unit, bool feed0 = true, bool feed1 = true) {
        live->manager->setFilter(unit == 0 ? nullptr : &second);
        if ((feed0 && live->camera[0]->queueFrame() != 0) ||
            (feed1 && live->camera[1]->queueFrame() != 0))
            return -3;
        return live->step(clock, 41, false) ? LivePreview_frameNumber(live->latestFrame()) : -2;
    }
    std::unique_ptr<LivePreview> live;
    SecondCamera secondLook;
    KivImaging second{&secondLook};
};

TEST_F(DualTest, BothCamerasAreDrawnEachFrame) {
    live->manager->setFilter(&second);
    ASSERT_TRUE(live->startPaced(clock));
    // A camera whose frames are not latched runs out of buffers within a
    // few frames (each step queues one on both).
    for (int i = 0; i < 6; ++i) ASSERT_TRUE(live->step(clock));
    EXPECT_EQ(live->framesShown(), 17u);
    EXPECT_EQ(showing(0), 7);
    EXPECT_EQ(showing(1), 10);
}

TEST_F(DualTest, StillsStandInForTheNamedCameraUntilApplied) {
    ASSERT_TRUE(live->startPaced(clock));
    ASSERT_EQ(
        live->manager->applyToPicture(picture(30, kW, kH).release(), picture(40, kW, kH).release()),
        0);
    live->manager->setDualShotAsyncCapture(DUAL_SHOT_STILL_CAMERA0);
    EXPECT_EQ(showing(0, false), 30);
    // Camera 1 goes on (two frames ahead of camera 0).
    EXPECT_EQ(showing(1, false), 4);
    live->manager->setDualShotAsyncCapture(DUAL_SHOT_APPLY);
    EXPECT_EQ(showing(0), 1);
    // The pictures went with the apply: a picture now has nothing to draw.
    ASSERT_TRUE(capture(*live, CAPTURE_PICTURE));
    ASSERT_EQ(got.errors().size(), 1u);
    EXPECT_EQ(got.errors()[0].code, VC_ERROR_INVALID_PARAM);
    EXPECT_EQ(got.errors()[0].message, "Failed to setup picture program and buffers");
    ASSERT_EQ(
        live->manager->applyToPicture(picture(50, kW, kH).release(), picture(60, kW, kH).release()),
        0);
    live->manager->setDualShotAsyncCapture(DUAL_SHOT_STILL_CAMERA1);
    EXPECT_EQ(showing(1, true, false), 60);
    EXPECT_EQ(showing(0, true, false), 4);
    EXPECT_EQ(log.count("EGL: Successfully created still image!"), 2u);
}

TEST_F(DualTest, SecondStillWithoutDataIsCameraOnesFrame) {
    ASSERT_TRUE(live->startPaced(clock));
    ASSERT_EQ(live->manager->applyToPicture(picture(30, kW, kH).release(),
                                            picture(0, kW, kH, false).release()),
              0);
    ASSERT_TRUE(live->step(clock));
    live->manager->setDualShotAsyncCapture(DUAL_SHOT_STILL_CAMERA1);
    // Camera 1's frame (two ahead of camera 0) when the still was made, then
    // frozen.
    EXPECT_EQ(showing(1, true, false), 3);
    EXPECT_EQ(showing(1, true, false), 3);
    EXPECT_EQ(log.count("Using preview data for the 2nd camera"), 1u);
}

TEST_F(DualTest, PictureNeedsBothPicturesAndIsNotRetried) {
    ASSERT_TRUE(live->startPaced(clock));
    ImagePtr base = picture(5, kW, kH);
    ASSERT_EQ(live->manager->applyToPicture(base.release(), nullptr), 0);
    ASSERT_TRUE(capture(*live, CAPTURE_PICTURE));
    for (int i = 0; i < 3; ++i) ASSERT_TRUE(live->step(clock));
    EXPECT_EQ(live->framesShown(), 15u);
    EXPECT_EQ(got.frames().size(), 0u);
    ASSERT_EQ(got.errors().size(), 1u);
    EXPECT_EQ(log.count("EGL: Taking a picture"), 1u);
    EXPECT_EQ(log.countPrefix("Incompatible input: dual camera is true, basePicture = 0x"), 1u);
    EXPECT_EQ(
        log.countPrefix("Could not setup a new GL environnment for a picture of size 64x48 'NV21'"),
        1u);
}

TEST_F(DualTest, PicturesOfTwoCamerasWithoutDataAreTheCamerasFrames) {
    live->manager->setFilter(&second);
    ASSERT_TRUE(live->startPaced(clock));
    ASSERT_EQ(live->manager->applyToPicture(picture(0, kW, kH, false).release(),
                                            picture(0, kW, kH, false).release()),
              0);
    ASSERT_TRUE(capture(*live, CAPTURE_PICTURE));
    ASSERT_EQ(got.frames().size(), 1u);
    // The look shows camera 1, two frames ahead: frame 3 for that render.
    EXPECT_EQ(LivePreview_frameNumber(got.frames()[0].bytes), 3);
    EXPECT_EQ(log.count("The first picture has no data. Using preview dimensions and data: 64x48"),
              1u);
    EXPECT_EQ(log.count("The second picture has no data. Using preview dimensions and data: 64x48"),
              1u);
}

}  // namespace
