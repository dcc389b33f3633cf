// kiv-test-labels: threads
// Snapshots on llvmpipe with real fences: pictures drawn through Sepia (or a
// two-camera mix) and posted in the listener's format, against the CPU
// statement of the look (tests/support/look_reference) within its tolerance.
#include "core/egl/EglSnapShot.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <regex>
#include <string>
#include <thread>
#include <vector>

#include "core/egl/AsyncImageConverter.h"
#include "core/egl/EglSnapShotLite.h"
#include "core/egl/Platform.h"
#include "core/filters/sce/fixedLooks.h"
#include "core/filters/sce/singleCameraEffects.h"
#include "support/frame_collector.h"
#include "support/gl_context.h"
#include "support/gl_fault.h"
#include "support/log_capture.h"
#include "support/look_reference.h"
#include "support/open_files.h"
#include "support/image_ptr.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_log.h"

using android::sp;

namespace {

const int kSepia = 401;
// Far beyond what a small capture needs, even on a loaded machine.
const EGLTimeKHR kPatient = 20000000000ULL;

// Half of each camera's picture: the two-camera look of these tests.
class MixEffect : public SingleCameraEffects {
public:
    int getFilterType() const override { return 391; }
    const char* getFragmentShader() const override {
        return "vec4 doEffect2() { return mix(texture2D(texSampler, v_texcoord), "
               "texture2D(texSampler2, v_texcoord), 0.5); }";
    }
};

// The program, an effect and a converter, on the test's context.
struct Rig {
    Rig(int cameraMode, bool asyncConverter) {
        program = new EglProgram();
        program->setCameraGeometryType(EglProgram::GEOMETRY_NORMAL, 0);
        program->setFilter(cameraMode == 20 ? static_cast<KivFilter*>(&mix) : &sepia);
        ok = program->initialize(cameraMode, false) == 0;
        converter = asyncConverter ? sp<ImageConverter>(new AsyncImageConverter(1))
                                   : sp<ImageConverter>(new SyncImageConverter);
    }
    ~Rig() {
        program->release();
        converter.clear();  // delivers what it accepted
    }
    Sepia sepia;
    MixEffect mix;
    sp<EglProgram> program;
    sp<ImageConverter> converter;
    bool ok;
};

// What the look makes of pictures, in format, and the largest difference
// allowed per byte: the look's tolerance, and one more for chroma, whose
// equations scale a difference of two RGB channels.
std::vector<uint8_t> expected(const std::vector<VCImage*>& pictures, uint32_t format) {
    std::vector<lookref::Picture> rgba;
    for (VCImage* p : pictures) {
        ImagePtr copy(VCImage_copyAndConvert(p, VC_FORMAT_RGBA));
        rgba.emplace_back(p->width, p->height, VCImageTest_bytes(*copy));
    }
    std::vector<uint8_t> look = rgba.size() == 1 ? lookref::render(kSepia, rgba[0], nullptr)
                                                 : std::vector<uint8_t>(rgba[0].rgba().size());
    if (rgba.size() == 2)
        for (size_t i = 0; i < look.size(); ++i)
            look[i] = static_cast<uint8_t>((rgba[0].rgba()[i] + rgba[1].rgba()[i] + 1) / 2);
    ImagePtr lookImage(
        VCImage_createWrap(look.data(), rgba[0].width(), rgba[0].height(), VC_FORMAT_RGBA, 0, 0));
    ImagePtr out(VCImage_copyAndConvert(lookImage.get(), format));
    return VCImageTest_bytes(*out);
}

struct Case {
    bool async, asyncConverter;
    uint32_t input, output;
    int width, height, pictures;
};

class SnapshotPictures : public GlContextTest, public testing::WithParamInterface<Case> {};

TEST_P(SnapshotPictures, MatchTheLookOnTheCpu) {
    const Case c = GetParam();
    LogCapture log;
    Rig rig(c.pictures == 2 ? 20 : 10, c.asyncConverter);
    ASSERT_TRUE(rig.ok);
    FrameCollector listener(c.output);
    std::vector<ImagePtr> owned;
    std::vector<VCImage*> pictures;
    for (int i = 0; i < c.pictures; ++i) {
        owned.push_back(VCImageTest_random(c.width, c.height, c.input, 7 + i));
        pictures.push_back(owned.back().get());
    }
    VCImage* pip = c.pictures == 2 ? pictures[1] : nullptr;
    {
        sp<EglSnapShot> snapshot = new EglSnapShot(mGl->env(), c.width, c.height, rig.converter);
        ASSERT_EQ(0, snapshot->initialize());
        for (int round = 0; round < 2; ++round) {  // the second reuses the images
            const int status = c.async ? snapshot->takePictureAsync(pictures[0], pip, rig.program,
                                                                    listener, 100 + round, kPatient)
                                       : snapshot->takePictureSync(pictures[0], pip, rig.program,
                                                                   listener, 100 + round);
            ASSERT_EQ(0, status);
        }
        snapshot->release();
    }
    rig.converter.clear();
    const std::vector<CollectedFrame> frames = listener.frames();
    ASSERT_EQ(2u, frames.size());
    const int tolerance = lookref::tolerance(kSepia) + (VCImage_isYUV(c.output) ? 1 : 0);
    const std::vector<uint8_t> want = expected(pictures, c.output);
    for (int round = 0; round < 2; ++round) {
        EXPECT_EQ(100 + round, frames[round].timestamp);
        EXPECT_EQ(c.output, frames[round].format);
        EXPECT_LE(VCImageTest_maxDifference(want, frames[round].bytes), tolerance) << round;
        // Asynchronous captures and converters post from a worker, never the caller.
        EXPECT_EQ(c.async || c.asyncConverter,
                  !pthread_equal(pthread_self(), frames[round].thread));
    }
}

const Case kCases[] = {
    {false, false, VC_FORMAT_RGBA, VC_FORMAT_RGBA, 33, 17, 1},
    {true, false, VC_FORMAT_RGBA, VC_FORMAT_NV21, 62, 34, 1},
    {false, true, VC_FORMAT_NV21, VC_FORMAT_NV21, 62, 34, 1},
    {true, true, VC_FORMAT_NV21, VC_FORMAT_RGBA, 48, 20, 1},
    {false, false, VC_FORMAT_RGBA, VC_FORMAT_RGBA, 31, 9, 2},
    {true, false, VC_FORMAT_NV21, VC_FORMAT_NV21, 40, 24, 2},
};
INSTANTIATE_TEST_SUITE_P(Captures, SnapshotPictures, testing::ValuesIn(kCases));

TEST(EglSnapShot, FittingAndCroppingAroundTheLargestTexture) {
    struct Fit {
        int max, w, h, outW, outH;
    };
    const Fit fits[] = {{4096, 4000, 3000, 4000, 3000}, {2048, 4000, 3000, 2048, 1536},
                        {2048, 3000, 4000, 1536, 2048}, {2048, 5000, 100, 2000, 40},
                        {64, 64, 64, 64, 64},           {64, 65, 64, 63, 63}};
    GlContext gl;
    ASSERT_TRUE(gl.ok());
    LogCapture log;
    sp<ImageConverter> converter = new SyncImageConverter;
    for (const Fit& f : fits) {
        Platform::setMaximumTextureSizeForTesting(f.max);
        sp<EglSnapShot> snapshot = new EglSnapShot(gl.env(), 8, 8, converter);
        int w = 0, h = 0;
        snapshot->fixSupportedSize(f.w, f.h, w, h);
        EXPECT_EQ(f.outW, w) << f.w << "x" << f.h << " max " << f.max;
        EXPECT_EQ(f.outH, h) << f.w << "x" << f.h << " max " << f.max;
    }
    // 100x70 on a GPU of 64: fitted to 62x44, cropped at (18, 12).
    Platform::setMaximumTextureSizeForTesting(64);
    sp<EglSnapShot> snapshot = new EglSnapShot(gl.env(), 100, 70, converter);
    ImagePtr big = VCImageTest_random(100, 70, VC_FORMAT_RGBA, 3);
    ImagePtr cropped(snapshot->cropImageSupportedSize(big.get()));
    ASSERT_NE(nullptr, cropped);
    ASSERT_EQ(62, cropped->width);
    ASSERT_EQ(44, cropped->height);
    EXPECT_EQ(0, cropped->wrapped);
    for (int y = 0; y < 44; ++y)
        ASSERT_EQ(0,
                  memcmp(cropped->data + y * 62 * 4, big->data + ((12 + y) * 100 + 18) * 4, 62 * 4))
            << y;
    // A picture that fits is wrapped, not copied.
    ImagePtr small = VCImageTest_random(62, 40, VC_FORMAT_NV21, 4);
    ImagePtr wrapped(snapshot->cropImageSupportedSize(small.get()));
    EXPECT_EQ(small->data, wrapped->data);
    EXPECT_EQ(1, wrapped->wrapped);
    EXPECT_EQ(nullptr, snapshot->cropImageSupportedSize(nullptr));
    // A picture that cannot be cropped falls back to the whole of it.
    ImagePtr stream(VCImage_createWrap(big->data, 100, 70, VC_FORMAT_JPEG, 1000, 0));
    log.clear();
    ImagePtr whole(snapshot->cropImageSupportedSize(stream.get()));
    EXPECT_EQ(big->data, whole->data);
    EXPECT_EQ(100, whole->width);
    EXPECT_EQ(1u, log.countPrefix("Failed to crop the input image (-"));
    Platform::resetForTesting();
}

// The fence seams: a wait that never ends in time, a wait answering nonsense,
// a platform without fences.
EGLint neverSignals(EGLDisplay, EGLSyncKHR, EGLint, EGLTimeKHR) {
    return EGL_TIMEOUT_EXPIRED_KHR;
}
EGLint answersNonsense(EGLDisplay, EGLSyncKHR, EGLint, EGLTimeKHR) {
    return EGL_FALSE;
}
EGLSyncKHR noFences(EGLDisplay, EGLenum, const EGLint*) {
    return EGL_NO_SYNC_KHR;
}

// The errors logged, "E text" with source line numbers as ":#", but the
// platform's line on each buffer lock (logged as an error on every read-back).
std::vector<std::string> errorsOf(const LogCapture& log) {
    std::vector<std::string> out;
    for (const LoggedLine& l : log.lines())
        if (l.level == VF_LOG_ERROR && l.text.rfind("EGL: lockGraphicBuffer format", 0) != 0)
            out.push_back("E " + std::regex_replace(l.text, std::regex(":[0-9]+$"), ":#"));
    return out;
}

// Every warning, error and status of the snapshots, one scenario a row.
TEST(EglSnapShot, LogLinesAndStatuses) {
    GlContext gl;
    ASSERT_TRUE(gl.ok());
    struct Row {
        const char* name;
        char kind;  // 's'napshot, 'l'ite, 'r'ead pixels, 'R'ead pixels failing in the driver
        bool async;
        uint32_t format;  // the listener's; 0 makes its conversion fail
        int pictures;     // 0: none given; 2 (or -1, the second missing) on a two-camera program
        EglSnapShotClientWait wait;
        bool noFence;
        int status, frames;
        std::vector<std::string> lines;  // every warning and error, in order
    };
    const EglSnapShotClientWait real = gEglSnapShotClientWait;
    const std::string kNull = "E VC_ERROR_NULL_PARAM (-2): core/egl/EglSnapShot:#",
                      kFail = "E EGL: Image conversion failed",
                      kUnknown = "E VC_ERROR_UNKNOWN (-1): core/egl/EglSnapShot";
    const std::vector<Row> rows = {
        // clang-format off
        {"no picture", 's', false, VC_FORMAT_RGBA, 0, real, false, -2, 0, {kNull}},
        {"no second picture", 's', true, VC_FORMAT_RGBA, -1, real, false, -2, 0, {kNull}},
        {"sync", 's', false, VC_FORMAT_NV21, 1, real, false, 0, 1, {}},
        {"async", 's', true, VC_FORMAT_NV21, 1, real, false, 0, 1, {}},
        {"timeout", 's', true, VC_FORMAT_NV21, 1, neverSignals, false, 0, 0,
         {"E EGL: Timeout expired: 5000 nanoseconds. Picture failed."}},
        {"odd answer", 'l', true, VC_FORMAT_RGBA, 1, answersNonsense, false, 0, 1,
         {"E EGL: eglClientWaitSyncKHR returned an invalid error code: 0. Continuing anyway."}},
        {"failed post", 's', false, 0, 1, real, false, -1, 0,
         {kFail, kUnknown + ":#", "E EGL: takePicture failed [sync] in readAndPost(): -1"}},
        {"failed dual post", 's', false, 0, 2, real, false, -1, 0,
         {kFail, kUnknown + ":#", "E EGL: takePicture failed [sync] in readAndPost(): -1",
          "E takePicture failed with dual picture: -1"}},
        {"failed async post", 's', true, 0, 1, real, false, 0, 0,
         {kFail, kUnknown + ":#", "E EGL: Picture failed with error -1"}},
        {"lite failed post", 'l', false, 0, 1, real, false, -1, 0,
         {kFail, kUnknown + "Lite:#",
          "E EGL: EglSnapShotLite::takePicture failed [sync] in readAndPost(): -1"}},
        // Without fences the capture ends on the render thread.
        {"no fences", 's', true, VC_FORMAT_RGBA, 1, real, true, 0, 1, {}},
        {"lite no fences", 'l', true, VC_FORMAT_RGBA, 1, real, true, 0, 1, {}},
        {"lite read pixels", 'r', false, VC_FORMAT_RGBA, 1, real, false, 0, 1, {}},
        {"lite read pixels fails", 'R', false, VC_FORMAT_RGBA, 1, real, false, -1, 0,
         {"E GL Error: 0x0501 'GL_INVALID_VALUE' - glReadPixels(0, 0, snapshot->width, "
          "snapshot->height, GL_RGBA, GL_UNSIGNED_BYTE, snapshot->data) at "
          "core/egl/EglSnapShotLite:#", kUnknown + "Lite:#"}},
        // clang-format on
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.name);
        LogCapture log;
        Rig rig(row.pictures == 2 || row.pictures < 0 ? 20 : 10, false);
        ASSERT_TRUE(rig.ok);
        FrameCollector listener(row.format);
        ImagePtr a = VCImageTest_random(16, 8, VC_FORMAT_RGBA, 1);
        ImagePtr b = VCImageTest_random(16, 8, VC_FORMAT_RGBA, 2);
        gEglSnapShotClientWait = row.wait;
        const EglSnapShotCreateSync realCreate = gEglSnapShotCreateSync;
        if (row.noFence) gEglSnapShotCreateSync = noFences;
        // A real fence gets all the time a loaded machine needs; the forced
        // timeout keeps the 5000 its line names.
        const EGLTimeKHR wait = row.wait == neverSignals ? 5000 : kPatient;
        int status;
        if (row.kind == 's') {
            sp<EglSnapShot> snapshot = new EglSnapShot(gl.env(), 16, 8, rig.converter);
            ASSERT_EQ(0, snapshot->initialize());
            VCImage* base = row.pictures != 0 ? a.get() : nullptr;
            VCImage* pip = row.pictures == 2 ? b.get() : nullptr;
            status = row.async
                         ? snapshot->takePictureAsync(base, pip, rig.program, listener, 1, wait)
                         : snapshot->takePictureSync(base, pip, rig.program, listener, 1);
            snapshot->release();
        } else {
            sp<EglSnapShotLite> lite = new EglSnapShotLite(gl.env(), 16, 8, rig.converter);
            ASSERT_EQ(0, lite->initialize());
            if (row.kind == 'R') GlFault_failPictureReads(1);
            status = row.kind != 'l' ? lite->takePictureReadPixels(rig.program, listener, 1)
                     : row.async     ? lite->takePictureAsync(rig.program, listener, 1, wait)
                                     : lite->takePictureSync(rig.program, listener, 1);
            lite->release();
        }
        gEglSnapShotClientWait = real;
        gEglSnapShotCreateSync = realCreate;
        EXPECT_EQ(row.status, status);
        EXPECT_EQ(static_cast<size_t>(row.frames), listener.frames().size());
        for (const CollectedFrame& f : listener.frames())
            EXPECT_EQ(row.async && !row.noFence, !pthread_equal(pthread_self(), f.thread));
        // In order; the converter's own lines (its suite's table) may come between.
        const std::vector<std::string> logged = errorsOf(log);
        auto at = logged.begin();
        for (const std::string& line : row.lines) {
            at = std::find(at, logged.end(), line);
            EXPECT_NE(at, logged.end()) << "missing or out of order: " << line;
        }
        if (row.lines.empty()) {
            EXPECT_EQ(std::vector<std::string>(), logged);
        }
    }
}

// A listener that holds the first frame until it is let go.
class HoldingListener : public FrameCollector {
public:
    HoldingListener() : FrameCollector(VC_FORMAT_RGBA) {}
    void onFrameProcessed(const VCImage& image, long long timestamp) override {
        if (timestamp == 1) {
            std::unique_lock<std::mutex> g(mLock);
            mChanged.wait(g, [&] { return mGo; });
        }
        FrameCollector::onFrameProcessed(image, timestamp);
    }
    void go() {
        std::lock_guard<std::mutex> g(mLock);
        mGo = true;
        mChanged.notify_all();
    }

private:
    std::mutex mLock;
    std::condition_variable mChanged;
    bool mGo = false;
};

// A capture started while the previous one still holds the images waits for
// them (the previous listener, run by a synchronous converter on the
// snapshot's queue, holds them); a wait that runs out fails the capture.
TEST_F(GlContextTest, CapturesWaitForThePreviousOne) {
    const std::string kWaiting =
        "In int EglSnapShot::takePictureAsync(const VCImage*, const VCImage*, const "
        "android::sp<EglProgram>&, OnFrameListener&, nsecs_t, EGLTimeKHR), Waiting for previous "
        "jobs to complete...";
    LogCapture log;
    Rig rig(10, false);
    ASSERT_TRUE(rig.ok);
    ImagePtr picture = VCImageTest_random(16, 8, VC_FORMAT_RGBA, 1);
    for (bool runOut : {false, true}) {
        HoldingListener listener;
        sp<EglSnapShot> snapshot = new EglSnapShot(mGl->env(), 16, 8, rig.converter);
        ASSERT_EQ(0, snapshot->initialize());
        ASSERT_EQ(0, snapshot->takePictureAsync(picture.get(), nullptr, rig.program, listener, 1,
                                                kPatient));
        log.clear();
        std::thread releaser;
        if (runOut) {
            snapshot->setPreviousCaptureTimeout(1000000);  // the held frame outlasts it for sure
            EXPECT_EQ(VC_ERROR_INVALID_STATE,
                      snapshot->takePictureAsync(picture.get(), nullptr, rig.program, listener, 2,
                                                 kPatient));
            EXPECT_TRUE(log.contains(VF_LOG_ERROR, "Timed out!"));
            listener.go();
        } else {
            releaser = std::thread([&] {
                while (!log.contains(kWaiting)) std::this_thread::yield();
                listener.go();
            });
            EXPECT_EQ(0, snapshot->takePictureAsync(picture.get(), nullptr, rig.program, listener,
                                                    2, kPatient));
            releaser.join();
        }
        snapshot->release();
        const std::vector<CollectedFrame> frames = listener.frames();
        ASSERT_EQ(runOut ? 1u : 2u, frames.size());
        for (size_t i = 0; i < frames.size(); ++i) EXPECT_EQ(long(i + 1), frames[i].timestamp);
    }
}

// Posts each image as it comes and notes where its pixels live; destroys it
// at once, or keeps the first one until the test lets it go.
class AddressConverter : public ImageConverter {
public:
    int convertAndPost(VCImage* image, OnFrameListener& listener, nsecs_t timestamp,
                       bool takeOwnership) override {
        EXPECT_TRUE(takeOwnership);
        addresses.push_back(image->data);
        const bool keep = hold && held == nullptr;
        listener.onFrameProcessed(*image, timestamp);
        if (keep)
            held = image;
        else
            VCImage_destroy(image);
        return 0;
    }
    std::vector<const unsigned char*> addresses;
    bool hold = false;
    VCImage* held = nullptr;
};

// The copy a capture posts is written into the previous copy's memory once
// the converter has destroyed that one (a fresh 12 MP buffer costs thousands
// of page faults a capture); a copy the converter still holds is never
// reused, and may outlive its snapshot.
TEST_F(GlContextTest, CapturesPostTheirCopiesInTheSameMemory) {
    LogCapture quiet;
    Rig rig(10, false);
    ASSERT_TRUE(rig.ok);
    ImagePtr picture = VCImageTest_random(32, 16, VC_FORMAT_RGBA, 3);
    for (int kind = 0; kind < 4; ++kind) {
        SCOPED_TRACE(kind);
        sp<AddressConverter> addresses = new AddressConverter;
        sp<ImageConverter> converter = addresses;
        FrameCollector listener(VC_FORMAT_RGBA);
        sp<EglSnapShot> snapshot = new EglSnapShot(mGl->env(), 32, 16, converter);
        sp<EglSnapShotLite> lite = new EglSnapShotLite(mGl->env(), 32, 16, converter);
        ASSERT_EQ(0, snapshot->initialize());
        ASSERT_EQ(0, lite->initialize());
        auto capture = [&](nsecs_t timestamp) {
            return kind == 0   ? snapshot->takePictureSync(picture.get(), nullptr, rig.program,
                                                           listener, timestamp)
                   : kind == 1 ? snapshot->takePictureAsync(picture.get(), nullptr, rig.program,
                                                            listener, timestamp, kPatient)
                   : kind == 2 ? lite->takePictureSync(rig.program, listener, timestamp)
                               : lite->takePictureReadPixels(rig.program, listener, timestamp);
        };
        addresses->hold = true;
        ASSERT_EQ(0, capture(1));
        ASSERT_TRUE(listener.waitFor(1));  // past the asynchronous capture's choice to hold
        addresses->hold = false;
        ASSERT_EQ(0, capture(2));
        // Plain allocation would hand the second copy's freed memory to this.
        void* squatter = malloc(32 * 16 * 4);
        ASSERT_EQ(0, capture(3));
        free(squatter);
        ASSERT_TRUE(listener.waitFor(3));
        const std::vector<const unsigned char*>& a = addresses->addresses;
        ASSERT_EQ(3u, a.size());
        EXPECT_NE(a[0], a[1]);  // the first is still held
        EXPECT_EQ(a[1], a[2]);
        snapshot->release();
        lite->release();
        snapshot.clear();
        lite.clear();
        VCImage_destroy(addresses->held);  // after its snapshot: freed, not kept
    }
}

// A thousand captures of each kind leave no GL object (the fixture counts
// them), buffer or memory file behind (ASan sees the memory).
TEST_F(GlContextTest, ThousandsOfCapturesLeaveNothingBehind) {
    LogCapture quiet;
    Rig rig(10, true);
    ASSERT_TRUE(rig.ok);
    FrameCollector listener(VC_FORMAT_NV21);
    ImagePtr picture = VCImageTest_random(16, 8, VC_FORMAT_NV21, 1);
    int files = -1;
    const int kEach = 250;
    for (int kind = 0; kind < 4; ++kind) {
        sp<EglSnapShot> snapshot = new EglSnapShot(mGl->env(), 16, 8, rig.converter);
        sp<EglSnapShotLite> lite = new EglSnapShotLite(mGl->env(), 16, 8, rig.converter);
        ASSERT_EQ(0, snapshot->initialize());
        ASSERT_EQ(0, lite->initialize());
        for (int i = 0; i < kEach; ++i) {
            // Every fourth picture changes size, so images are made anew too.
            ImagePtr other = VCImageTest_random(16, 8 - 2 * (i % 4 == 3), VC_FORMAT_NV21, i);
            VCImage* p = i % 4 == 3 ? other.get() : picture.get();
            const int status =
                kind == 0 ? snapshot->takePictureSync(p, nullptr, rig.program, listener, i)
                : kind == 1
                    ? snapshot->takePictureAsync(p, nullptr, rig.program, listener, i, kPatient)
                : kind == 2 ? lite->takePictureSync(rig.program, listener, i)
                            : lite->takePictureAsync(rig.program, listener, i, kPatient);
            ASSERT_EQ(0, status) << kind << " " << i;
            // Host buffers keep a few recycled memory files: counted once warm.
            if (kind == 0 && i == 20) files = Test_openFiles();
        }
        snapshot->release();
        lite->release();
    }
    const bool all = listener.waitFor(4 * kEach);
    // Captures follow each other on one buffer: never two locks at once.
    EXPECT_EQ(0u, quiet.countPrefix("EGL: Failed to lock"));
    ASSERT_TRUE(all) << listener.frames().size() << " frames; " << quiet.countPrefix("EGL: Timeout")
                     << " timeouts, " << quiet.countPrefix("EGL: Picture failed") << " failures";
    EXPECT_EQ(4u * kEach, listener.frames().size());
    EXPECT_EQ(files, Test_openFiles());
}

}  // namespace
