// The render manager on real GL, end to end: virtual cameras feed numbered
// frames, the preview is a host window the test reads, and the frame pacing
// runs on a clock the test moves. Each shown frame is checked against the
// effect computed on the CPU over the frame the camera sent.
// kiv-test-labels: threads
#include "kivimaging/OpenGLManager.h"

#include <gtest/gtest.h>
#include <system/window.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <condition_variable>
#include <functional>
#include <future>
#include <mutex>
#include <thread>

#include "core/KivImaging.h"
#include "core/egl/EglWindowSurface.h"
#include "core/filters/sce/fixedLooks.h"
#include "kivhost/VirtualCamera.h"
#include "support/camera_frames.h"
#include "support/eventually.h"
#include "support/gl_fault.h"
#include "support/image_ptr.h"
#include "support/live_preview.h"
#include "support/log_capture.h"
#include "support/look_reference.h"
#include "support/manual_clock.h"
#include "vccore/vc_log.h"

namespace {

const int kW = 64, kH = 48;

// Each test owns the clock (installed before the render thread starts) and
// the log capture.
class ManagerTest : public ::testing::Test {
public:
    void start(LivePreview& live, bool firstFrame = true) {
        if (firstFrame) {
            ASSERT_TRUE(live.startPaced(clock));
        } else {
            ASSERT_TRUE(live.start(false));
        }
    }
    void step(LivePreview& live, int ms = 41, bool frame = true) {
        ASSERT_TRUE(live.step(clock, ms, frame));
    }
    // The render thread has stopped by itself.
    void expectStopped() { ASSERT_TRUE(logged("In RenderThread::destroy")); }
    bool logged(const char* prefix) {
        return eventually([&] { return log.countPrefix(prefix) > 0; });
    }

    LogCapture log;
    ManualClock clock;
};

// Effects switch on the frame that follows setFilter, and each frame shown
// is the effect over the camera frame latched for it.
class EffectTest : public ManagerTest, public ::testing::WithParamInterface<std::pair<int, int>> {};

TEST_P(EffectTest, EachShownFrameIsTheEffectOverTheLatchedFrame) {
    LivePreviewEffect first(GetParam().first), second(GetParam().second);
    LivePreview live;
    live.manager->setFilter(&first.imaging);
    ASSERT_NO_FATAL_FAILURE(start(live));
    auto expect = [&](int look, uint64_t index, const char* label) {
        const std::vector<uint8_t> shown = live.latestFrame();
        ASSERT_EQ(shown.size(), (size_t)kW * kH * 4) << label;
        lookref::expectLook(look, lookref::Picture(kW, kH, CameraFrames_rgba(index, kW, kH)),
                            shown.data(), label);
    };
    expect(GetParam().first, 0, "frame 0");
    ASSERT_NO_FATAL_FAILURE(step(live));
    expect(GetParam().first, 1, "frame 1");
    live.manager->setFilter(&second.imaging);
    ASSERT_NO_FATAL_FAILURE(step(live));
    expect(GetParam().second, 2, "frame 2, after the switch");
    live.manager->setFilter(nullptr);
    ASSERT_NO_FATAL_FAILURE(step(live));
    expect(400, 3, "frame 3, no effect");
    live.release();
}

INSTANTIATE_TEST_SUITE_P(Looks, EffectTest,
                         ::testing::Values(std::make_pair(401, 403), std::make_pair(402, 400),
                                           std::make_pair(415, 401)));

TEST_F(ManagerTest, PacesTo41MsAndMakesUpForOvershoot) {
    LivePreview live;
    ASSERT_NO_FATAL_FAILURE(start(live));
    // Every period is cut one millisecond short first: nothing may be shown.
    const struct {
        int period;
        int advanceFirst;  // the rest of the period comes after
    } periods[] = {
        {41, 40},
        {45, 45},  // overslept by 4 ms ...
        {37, 36},  // ... so the next period is 4 ms shorter
        {41, 40},  // and the one after is whole again
    };
    uint64_t shown = 11;
    for (const auto& p : periods) {
        const size_t waits = clock.waitsBegun();
        ASSERT_EQ(live.camera[0]->queueFrame(), 0);
        clock.advanceMs(p.advanceFirst);
        if (p.advanceFirst < p.period) {
            EXPECT_EQ(clock.waitsBegun(), waits) << "woke before " << p.period << " ms";
            EXPECT_EQ(live.framesShown(), shown);
            clock.advanceMs(p.period - p.advanceFirst);
        }
        ASSERT_TRUE(clock.waitForWaitsBegun(waits + 1));
        EXPECT_EQ(live.framesShown(), ++shown) << "period of " << p.period << " ms";
    }
    live.release();
}

TEST_F(ManagerTest, RequestedRenderComes16MsAfterTheLastOneBegan) {
    LivePreview live;
    ASSERT_NO_FATAL_FAILURE(start(live));
    ASSERT_EQ(live.camera[0]->queueFrame(), 0);
    clock.advanceMs(5);
    const size_t waits = clock.waitsBegun();
    live.manager->requestRender();
    // The pacing wait ends and a second one, capped at 16 ms, begins.
    ASSERT_TRUE(clock.waitForWaitsBegun(waits + 1));
    clock.advanceMs(10);
    EXPECT_EQ(live.framesShown(), 11u);
    clock.advanceMs(1);
    ASSERT_TRUE(clock.waitForWaitsBegun(waits + 2));
    EXPECT_EQ(live.framesShown(), 12u);
    EXPECT_EQ(LivePreview_frameNumber(live.latestFrame()), 1);
    live.release();
}

// requestRender() changes nothing during the first ten frames (the
// initialising one waits for the camera's first frame, which a request would
// end) nor while recording (the pacing wait runs its whole period).
class IgnoredRequestTest : public ManagerTest, public ::testing::WithParamInterface<bool> {};

TEST_P(IgnoredRequestTest, RequestRenderChangesNothing) {
    const bool recording = GetParam();
    LivePreview live;
    android::sp<android::HostWindow> recorder = new android::HostWindow(kW, kH);
    if (recording) {
        ASSERT_NO_FATAL_FAILURE(start(live));
        ASSERT_EQ(live.manager->setRecordingSurface(recorder->getIGraphicBufferProducer()), 0);
        ASSERT_NO_FATAL_FAILURE(step(live));  // the recording surface is built
        ASSERT_NO_FATAL_FAILURE(step(live));
        ASSERT_EQ(recorder->queuedTotal(), 1u);
        ASSERT_EQ(live.camera[0]->queueFrame(), 0);
        clock.advanceMs(5);
    } else {
        ASSERT_NO_FATAL_FAILURE(start(live, false));
        ASSERT_TRUE(clock.waitForWaiters(1));
    }
    const size_t waits = clock.waitsBegun();
    const uint64_t shown = live.framesShown();
    live.manager->requestRender();
    // Proving that nothing happens takes a while of real time: a fifth of a
    // second is far more than an honoured request needs to end the wait.
    for (int i = 0; i < 200; ++i) {
        ASSERT_EQ(clock.waitsBegun(), waits);
        ASSERT_EQ(live.framesShown(), shown);
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }
    if (recording) {
        clock.advanceMs(35);  // 40 ms into the period: still waiting
        EXPECT_EQ(clock.waitsBegun(), waits);
        clock.advanceMs(1);
        ASSERT_TRUE(clock.waitForWaitsBegun(waits + 1));
        EXPECT_EQ(recorder->queuedTotal(), 2u);
    } else {
        ASSERT_EQ(live.camera[0]->queueFrame(), 0);
        ASSERT_TRUE(clock.waitForWaitsBegun(waits + 1));
        EXPECT_EQ(LivePreview_frameNumber(live.latestFrame()), 0);
    }
    EXPECT_EQ(live.framesShown(), recording ? shown + 1 : 11u);
    live.release();
}

INSTANTIATE_TEST_SUITE_P(WhileUnpacedOrRecording, IgnoredRequestTest, ::testing::Bool());

TEST_F(ManagerTest, StoppedPreviewKeepsLatchingButShowsNothing) {
    LivePreview live;
    ASSERT_NO_FATAL_FAILURE(start(live));
    live.manager->stopPreview();
    // Still paced, still latching (the camera never runs out of buffers).
    for (int i = 0; i < 6; ++i) ASSERT_NO_FATAL_FAILURE(step(live));
    EXPECT_EQ(live.framesShown(), 11u);
    live.release();
}

TEST_F(ManagerTest, FlushedCameraDrainsToTheNewestFrameEveryOtherRender) {
    LivePreview live;
    ASSERT_NO_FATAL_FAILURE(start(live));
    live.manager->flushCameraSource();
    // The camera runs a frame ahead: the first render after the flush
    // latches the oldest queued frame, the next one drains to the newest.
    ASSERT_EQ(live.camera[0]->queueFrame(), 0);
    ASSERT_NO_FATAL_FAILURE(step(live));
    EXPECT_EQ(LivePreview_frameNumber(live.latestFrame()), 1);
    ASSERT_NO_FATAL_FAILURE(step(live));
    EXPECT_EQ(LivePreview_frameNumber(live.latestFrame()), 3);
    ASSERT_EQ(live.camera[0]->queueFrame(), 0);
    ASSERT_NO_FATAL_FAILURE(step(live));
    EXPECT_EQ(LivePreview_frameNumber(live.latestFrame()), 4)
        << "4 and 5 queued, the oldest latched";
    ASSERT_NO_FATAL_FAILURE(step(live));
    EXPECT_EQ(LivePreview_frameNumber(live.latestFrame()), 6)
        << "5 and 6 queued, drained to the newest";
    live.release();
}

// Layouts, modes and display modes: what reaches the screen.
struct ScreenCase {
    const char* name;
    int layout;
    OpenGLManagerMode mode;
    DisplayDeviceMode display;
    bool mirrored;
};
class ScreenTest : public ManagerTest, public ::testing::WithParamInterface<ScreenCase> {};

TEST_P(ScreenTest, ShowsTheCameraTheWayTheLayoutSays) {
    const ScreenCase& c = GetParam();
    LivePreviewSetup setup;
    setup.layout = c.layout;
    setup.mode = c.mode;
    setup.display = c.display;
    LivePreview live(setup);
    ASSERT_NO_FATAL_FAILURE(start(live));
    ASSERT_NO_FATAL_FAILURE(step(live));
    std::vector<uint8_t> want = CameraFrames_rgba(1, kW, kH);
    if (c.mirrored) want = LivePreview_mirror(want, kW, kH);
    EXPECT_LE(VCImageTest_maxDifference(want, live.latestFrame()), 1);
    const uint64_t sw = EglWindowSurface::kSoftwarePreviewUsage;
    EXPECT_EQ((live.preview->getConsumerUsage() & sw) == sw, c.display == DISPLAY_DEVICE_SOFTWARE);
    live.release();
}

INSTANTIATE_TEST_SUITE_P(
    Cases, ScreenTest,
    ::testing::Values(ScreenCase{"single", CAMERA_LAYOUT_SINGLE, OPENGL_MANAGER_DIRECT,
                                 DISPLAY_DEVICE_GPU, false},
                      ScreenCase{"mirrored", CAMERA_LAYOUT_SINGLE_MIRRORED, OPENGL_MANAGER_DIRECT,
                                 DISPLAY_DEVICE_GPU, true},
                      ScreenCase{"intermediate", CAMERA_LAYOUT_SINGLE, OPENGL_MANAGER_INTERMEDIATE,
                                 DISPLAY_DEVICE_GPU, false},
                      ScreenCase{"software", CAMERA_LAYOUT_SINGLE, OPENGL_MANAGER_DIRECT,
                                 DISPLAY_DEVICE_SOFTWARE, false}),
    [](const ::testing::TestParamInfo<ScreenCase>& info) { return info.param.name; });

// The manager's own log lines, scenario by scenario: level, start of the
// line (the rest is a pointer or a source line) and how many times.
struct LogLine {
    int level;
    const char* text;
    size_t count;
    bool prefix = false;  // the line only starts with text
};
struct LogCase {
    const char* name;
    LivePreviewSetup setup;
    std::function<void(LivePreview&, ManagerTest&)> run;
    std::vector<LogLine> lines;
};
class LogTest : public ManagerTest, public ::testing::WithParamInterface<LogCase> {};

LivePreviewSetup withoutWindow() {
    LivePreviewSetup s;
    s.previewWindow = false;
    return s;
}
LivePreviewSetup intermediate() {
    LivePreviewSetup s;
    s.mode = OPENGL_MANAGER_INTERMEDIATE;
    s.height = 1440;
    s.width = 1080;
    return s;
}

// `failures` make-currents of the preview fail in a row: each waits out a
// frame period and tries again; the fiftieth stops the thread.
void failMakeCurrents(LivePreview& live, ManagerTest& t, int failures) {
    ASSERT_NO_FATAL_FAILURE(t.start(live));
    GlFault_failMakeCurrents(failures);
    for (int i = 1; i < 50 && i <= failures; ++i) ASSERT_NO_FATAL_FAILURE(t.step(live, 41, false));
    if (failures < 50) {
        ASSERT_NO_FATAL_FAILURE(t.step(live, 41, false));
        EXPECT_EQ(live.framesShown(), 12u);
    } else {
        t.clock.advanceMs(41);
        ASSERT_NO_FATAL_FAILURE(t.expectStopped());
        EXPECT_EQ(live.framesShown(), 11u);
    }
    GlFault_failMakeCurrents(0);
}

const int D = VF_LOG_DEBUG, W = VF_LOG_WARNING, E = VF_LOG_ERROR;
const char kTooMany[] = "EGL ERROR: eglMakeCurrent() failed too many times. Now requesting stop.";

TEST_P(LogTest, LinesAndLevels) {
    const LogCase& c = GetParam();
    {
        LivePreview live(c.setup);
        c.run(live, *this);
        live.release();
    }
    const std::vector<LoggedLine> lines = log.lines();
    for (const LogLine& l : c.lines) {
        const std::string text = l.text;
        const size_t n = std::count_if(lines.begin(), lines.end(), [&](const LoggedLine& line) {
            return line.level == l.level &&
                   (l.prefix ? line.text.rfind(text, 0) == 0 : line.text == text);
        });
        EXPECT_EQ(n, l.count) << c.name << ": " << text;
    }
}

INSTANTIATE_TEST_SUITE_P(
    Scenarios, LogTest,
    ::testing::Values(
        LogCase{"session",
                {},
                [](LivePreview& live, ManagerTest& t) {
                    LivePreviewEffect sepia(401);
                    live.manager->setFilter(&sepia.imaging);
                    ASSERT_NO_FATAL_FAILURE(t.start(live));
                    live.manager->setSaveAsFlipped(true);
                    live.manager->setSaveAsFlipped(false);
                    live.release();
                },
                {{D, "Creating new OpenGL thread: ", 1, true},
                 {D, "EGL: KivCamera native window geometry 64x48 [0x", 1, true},
                 {D, "EGL: setFilter: 0x", 1, true},
                 {D, "In getNewPreviewWindowForOpenGL, mPreviewANativeWindow = 0x", 1, true},
                 {D, "EGL: Ready to run now!", 1},
                 {D, "EGL: render() - initialize", 1},
                 {D, "EGL: render() - ready", 1},
                 {D, "EGL: Updated window geometry to 64x48 [0x", 1, true},
                 {E, "OpenGLManager::setSaveAsFlipped: true", 1},
                 {E, "OpenGLManager::setSaveAsFlipped: false", 1},
                 // The destructor releases once more.
                 {D, "OpenGLManager::release", 2},
                 {D, "In RenderThread::destroy current thread ", 1, true},
                 {D, "OpenGLManager::releaseFromGL", 1},
                 {D, "OpenGLManager::releaseCommon", 3},
                 {D, "EGL: RenderThread is finally destroyed!", 1},
                 {D, "Destroying OpenGLManager...", 1},
                 {E, "EGL ERROR", 0, true}}},
        LogCase{
            "misuse",
            {},
            [](LivePreview& live, ManagerTest& t) {
                ASSERT_NO_FATAL_FAILURE(t.start(live));
                live.manager->startRenderThread();
                EXPECT_EQ(live.manager->getNewPreviewWindowForOpenGL(2), nullptr);
                EXPECT_EQ(live.manager->getNewPreviewWindowForOpenGL(-1), nullptr);
                // The first thread still runs.
                ASSERT_NO_FATAL_FAILURE(t.step(live));
                EXPECT_EQ(live.framesShown(), 12u);
            },
            {{E, "EGL Error: Render thread is running!! void OpenGLManager::startRenderThread():",
              1, true},
             {D, "Creating new OpenGL thread: ", 1, true},
             {E, "getNewPreviewWindowForOpenGL: invalid id 2", 1},
             {E, "getNewPreviewWindowForOpenGL: invalid id -1", 1}}},
        LogCase{"never started",
                {},
                [](LivePreview& live, ManagerTest&) { live.release(); },
                {{D, "OpenGLManager::release", 2},
                 {D, "OpenGLManager::releaseCommon", 2},
                 {D, "EGL: Waiting until", 0, true},
                 {D, "EGL: RenderThread is finally destroyed!", 0}}},
        LogCase{"no preview window",
                withoutWindow(),
                [](LivePreview& live, ManagerTest& t) {
                    ASSERT_TRUE(live.start());
                    ASSERT_NO_FATAL_FAILURE(t.expectStopped());
                },
                {{W, "EGL: called OpenGLManager::setPreviewWindow with NULL window", 1},
                 {W, "EGL: Not calling eglSwapBuffers as OpenGLManager is being released.", 1},
                 {E, "EGL: Last call to swapBuffers failed. Now requesting stop.", 1},
                 // The frame counted, the next render sees the stop.
                 {D, "EGL: render() - ready", 1},
                 {D, "In RenderThread::destroy current thread ", 1, true}}},
        LogCase{"failing swap",
                {},
                [](LivePreview& live, ManagerTest& t) {
                    ASSERT_NO_FATAL_FAILURE(t.start(live));
                    // The display drops the window: the swap has no buffer to go to.
                    live.preview->abandon();
                    ASSERT_EQ(live.camera[0]->queueFrame(), 0);
                    t.clock.advanceMs(41);
                    ASSERT_NO_FATAL_FAILURE(t.expectStopped());
                },
                {{W, "EGL: eglSwapBuffers failed.", 1},
                 {E, "EGL: Last call to swapBuffers failed. Now requesting stop.", 1}}},
        LogCase{"49 failed make-currents",
                {},
                [](LivePreview& live, ManagerTest& t) { failMakeCurrents(live, t, 49); },
                {{E, "EGL: Call to eglMakeCurrent() failed 49 time(s)", 1},
                 {E, "EGL: Call to eglMakeCurrent() failed 50 time(s)", 0},
                 {E, kTooMany, 0}}},
        LogCase{"50 failed make-currents",
                {},
                [](LivePreview& live, ManagerTest& t) { failMakeCurrents(live, t, 50); },
                {{E, "EGL: Call to eglMakeCurrent() failed 49 time(s)", 1},
                 {E, "EGL: Call to eglMakeCurrent() failed 50 time(s)", 1},
                 {E, kTooMany, 1}}},
        LogCase{"intermediate image",
                intermediate(),
                [](LivePreview& live, ManagerTest& t) { ASSERT_NO_FATAL_FAILURE(t.start(live)); },
                // Taller than 1080: scaled down to 1080 rows, width ceil(1080 * 1080 / 1440).
                {{D, "bool OpenGLManager::initializeRecordingFBO() : 810 x 1080", 1},
                 {E, "EGL: Copy program could not be loaded.", 0}}}),
    [](const ::testing::TestParamInfo<LogCase>& info) {
        std::string name = info.param.name;
        for (char& ch : name) ch = isalnum((unsigned char)ch) ? ch : '_';
        return name;
    });

// Faults ----------------------------------------------------------------------

TEST_F(ManagerTest, ReleaseEndsTheWaitForACameraThatNeverSendsAFrame) {
    LivePreview live;
    ASSERT_NO_FATAL_FAILURE(start(live, false));
    ASSERT_TRUE(clock.waitForWaiters(1));
    // The clock never moves: only the wake-up can end the wait.
    auto released = std::async(std::launch::async, [&] { live.release(); });
    ASSERT_EQ(released.wait_for(std::chrono::seconds(20)), std::future_status::ready);
    EXPECT_EQ(live.framesShown(), 0u);
    EXPECT_EQ(log.countPrefix("EGL ERROR: Timed out"), 0u);
    EXPECT_EQ(log.count("EGL: RenderThread is finally destroyed!"), 1u);
}

// An effect whose drawing blocks until the test lets it go: a render thread
// that does not answer.
class StuckSepia : public Sepia {
public:
    int onDrawFrame(EglProgram& program) override {
        std::unique_lock<std::mutex> lock(mLock);
        mStuck = mArmed;
        mChanged.notify_all();
        mChanged.wait(lock, [&] { return !mArmed; });
        mStuck = false;
        return Sepia::onDrawFrame(program);
    }
    void arm(bool armed) {
        std::lock_guard<std::mutex> guard(mLock);
        mArmed = armed;
        mChanged.notify_all();
    }
    bool waitStuck() {
        std::unique_lock<std::mutex> lock(mLock);
        return mChanged.wait_for(lock, std::chrono::seconds(20), [&] { return mStuck; });
    }

private:
    std::mutex mLock;
    std::condition_variable mChanged;
    bool mArmed = false, mStuck = false;
};

TEST_F(ManagerTest, DestroyThatDoesNotFinishGivesUpAfter2500And250Ms) {
    StuckSepia effect;
    KivImaging imaging(&effect);
    LivePreview live;
    live.manager->setFilter(&imaging);
    ASSERT_NO_FATAL_FAILURE(start(live));
    effect.arm(true);
    const size_t waits = clock.waitsBegun();
    clock.advanceMs(41);
    ASSERT_TRUE(effect.waitStuck());
    auto released = std::async(std::launch::async, [&] { live.manager->release(); });
    // A failed check must not leave release() waiting on a clock that no
    // longer moves, or the thread stuck.
    struct OnExit {
        std::function<void()> run;
        ~OnExit() { run(); }
    } unstick{[&] {
        effect.arm(false);
        clock.advanceMs(10000);
    }};
    ASSERT_TRUE(clock.waitForWaitsBegun(waits + 1));
    // Waited on in slices of at most 100 ms: each step ends one.
    for (int ms = 100; ms <= 2500; ms += 100) {
        EXPECT_EQ(log.countPrefix("EGL ERROR: Timed out"), 0u) << "at " << ms - 100 << " ms";
        const size_t begun = clock.waitsBegun();
        clock.advanceMs(100);
        ASSERT_TRUE(clock.waitForWaitsBegun(begun + 1)) << "at " << ms << " ms";
    }
    // Timed out at 2.5 s; the thread is alive, so 0.25 s more.
    EXPECT_EQ(log.count("EGL ERROR: Timed out while waiting for destroy."), 1u);
    EXPECT_EQ(log.count("EGL: The thread is probably still alive, waiting a bit more..."), 1u);
    clock.advanceMs(249);
    EXPECT_EQ(log.countPrefix("EGL: Waiting returned"), 0u);
    clock.advanceMs(1);
    ASSERT_TRUE(logged("EGL: Waiting returned -110: Connection timed out"));
    effect.arm(false);
    ASSERT_EQ(released.wait_for(std::chrono::seconds(20)), std::future_status::ready);
    EXPECT_EQ(log.count("EGL ERROR: Timed out while waiting for destroy."), 1u);
    EXPECT_EQ(log.count("EGL: RenderThread is finally destroyed!"), 1u);
    live.release();
}

}  // namespace
