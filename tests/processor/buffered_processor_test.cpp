// The buffered processor end to end on llvmpipe: every fixed look through the
// RGBA, BGRA and NV21 paths compared with the CPU statement of its math, the
// effect fallbacks, status codes, log lines (also of driver failures injected
// into the real GL), and GL objects and memory over many calls.
#include <gtest/gtest.h>

#include <EGL/egl.h>
#include <GLES2/gl2.h>

#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "core/KivFilter.h"
#include "core/VFilterBufferedProcessor.h"
#include "core/VFilterBufferedProcessorImpl.h"
#include "core/egl/Platform.h"
#include "support/gl_context.h"
#include "support/gl_fault.h"
#include "support/open_files.h"
#include "support/log_capture.h"
#include "support/look_reference.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_image.h"
#include "vccore/vc_log.h"

namespace {

std::vector<uint8_t> swapRB(const std::vector<uint8_t>& in) {
    std::vector<uint8_t> out(in);
    for (size_t i = 0; i < out.size(); i += 4) std::swap(out[i], out[i + 2]);
    return out;
}

class BufferedProcessorTest : public ::testing::Test {
protected:
    void SetUp() override {
        mProcessor = static_cast<VFilterBufferedProcessorImpl*>(BufferedProcessor_Create());
        ASSERT_NE(nullptr, mProcessor);
        ASSERT_EQ(0, mProcessor->initialize());
    }
    void TearDown() override {
        if (mProcessor != nullptr) {
            mProcessor->release();
            BufferedProcessor_Destroy(mProcessor);
        }
    }
    VFilterBufferedProcessorImpl* mProcessor = nullptr;
};

}  // namespace

TEST(BufferedProcessorApi, VersionCreateDestroyAndThreadRecord) {
    EXPECT_EQ(3, BufferedProcessor_GetVersion());
    LogCapture log;
    VFilterBufferedProcessor* p = BufferedProcessor_Create();
    ASSERT_NE(nullptr, p);
    EXPECT_NE(nullptr, dynamic_cast<VFilterBufferedProcessorImpl*>(p));
    EXPECT_TRUE(pthread_equal(pthread_self(), gOpenGLManagerThread));
    BufferedProcessor_Destroy(p);
    EXPECT_EQ(0u, static_cast<unsigned long>(gOpenGLManagerThread));
    BufferedProcessor_Destroy(nullptr);
    std::vector<std::string> want = {"EGL: BufferedProcessor_Create",
                                     "EGL: BufferedProcessor_Destroy",
                                     "EGL: BufferedProcessor_Destroy"};
    EXPECT_EQ(want, log.texts());
}

TEST(BufferedProcessorApi, EffectSelectionFallsBackToPassThrough) {
    VFilterBufferedProcessorImpl p;
    LogCapture log;
    EXPECT_EQ(0, p.setEffectParameter("intensity=3"));  // nothing held: nothing happens
    EXPECT_EQ(nullptr, p.getEffect());
    EXPECT_EQ(0, p.setEffect(401));
    ASSERT_NE(nullptr, p.getEffect());
    EXPECT_EQ(401, p.getEffect()->getFilterType());
    EXPECT_TRUE(log.contains(1, "virtual int VFilterBufferedProcessorImpl::setEffect(int) : 401"));
    for (int unknown : {-1, 404, 509, 1999}) {
        EXPECT_EQ(0, p.setEffect(unknown));
        ASSERT_NE(nullptr, p.getEffect());
        EXPECT_EQ(400, p.getEffect()->getFilterType()) << unknown;
    }
    // An unknown library name goes through the shared selection: a
    // downloadable filter, which stays without a plug-in (no such library).
    auto attempts = [&log]() {
        std::vector<std::string> ids;
        for (const std::string& l : log.texts())
            if (l.rfind("Trying to instantiate effect ", 0) == 0) ids.push_back(l.substr(29));
        return ids;
    };
    log.clear();
    EXPECT_EQ(0, p.setEffect("no.such.package,libnothing.so"));
    EXPECT_EQ((std::vector<std::string>{"2000"}), attempts());
    EXPECT_EQ(2000, p.getEffect()->getFilterType());
    // A built-in library name tries its own id (not a downloadable filter);
    // 501 has no effect here, so 400 follows.
    log.clear();
    EXPECT_EQ(0, p.setEffect("com.morvane.android.provider.filterprovider,libfilm.so"));
    EXPECT_EQ((std::vector<std::string>{"501", "400"}), attempts());
    EXPECT_EQ(400, p.getEffect()->getFilterType());
    EXPECT_EQ(0, p.setEffect(static_cast<const char*>(nullptr)));
    ASSERT_NE(nullptr, p.getEffect());
    EXPECT_EQ(400, p.getEffect()->getFilterType());
    EXPECT_EQ(0, p.setEffect(443));
    EXPECT_EQ(0, p.setEffectParameter("intensity=3"));
    EXPECT_EQ(443, p.getEffect()->getFilterType());
    EXPECT_TRUE(log.contains(1,
                             "virtual int VFilterBufferedProcessorImpl::setEffect(const char*) "
                             ": com.morvane.android.provider.filterprovider,libfilm.so"));
    EXPECT_TRUE(log.contains(1,
                             "virtual int VFilterBufferedProcessorImpl::setEffectParameter("
                             "const char*) : intensity=3"));
    EXPECT_EQ(0, p.release());
}

TEST(BufferedProcessorApi, StatusCodesWithoutContextOrBuffers) {
    VFilterBufferedProcessorImpl p;
    std::vector<uint8_t> in(16 * 4, 7), out(16 * 4, 0xAB);
    LogCapture log;
    EXPECT_EQ(-3, p.doProcessRGBA(nullptr, 4, 4, out.data(), VC_FORMAT_RGBA));
    EXPECT_EQ(-3, p.doProcessRGBA(in.data(), 4, 4, nullptr, VC_FORMAT_BGRA));
    EXPECT_EQ(-3, p.doProcessNV21(nullptr, 4, 4, out.data()));
    EXPECT_EQ(-3, p.doProcessNV21(in.data(), 4, 4, nullptr));
    // Never initialised: no surface to bind.
    EXPECT_EQ(-7, p.doProcessRGBA(in.data(), 4, 4, out.data(), VC_FORMAT_RGBA));
    EXPECT_EQ(-7, p.doProcessNV21(in.data(), 4, 4, out.data()));
    EXPECT_EQ(std::vector<uint8_t>(16 * 4, 0xAB), out);
    // bindGLEnvironment's line and the caller's own, for each call.
    EXPECT_EQ(4u,
              log.countPrefix("VC_ERROR_INVALID_STATE (-7): core/VFilterBufferedProcessorImpl:"));
}

TEST_F(BufferedProcessorTest, EveryLookThroughRgbaAndBgra) {
    // Odd sizes on purpose: no symmetry can hide a row or column mix-up.
    const int w = 61, h = 47;
    lookref::Picture picture(w, h, lookref::makeTestPicture(w, h, false));
    std::vector<uint8_t> bgraIn = swapRB(picture.rgba());
    for (int id : lookref::lookIds()) {
        ASSERT_EQ(0, mProcessor->setEffect(id));
        std::vector<uint8_t> out(w * h * 4, 0x5A);
        ASSERT_EQ(
            0, mProcessor->doProcessRGBA(picture.rgba().data(), w, h, out.data(), VC_FORMAT_RGBA));
        lookref::expectLook(id, picture, out.data(), "RGBA");
        std::vector<uint8_t> bgraOut(w * h * 4, 0x5A);
        ASSERT_EQ(0,
                  mProcessor->doProcessRGBA(bgraIn.data(), w, h, bgraOut.data(), VC_FORMAT_BGRA));
        lookref::expectLook(id, picture, swapRB(bgraOut).data(), "BGRA");
    }
}

TEST_F(BufferedProcessorTest, EveryLookThroughNv21EvenAndOddHeight) {
    // 64x47 is padded to 64x48: with an even width the chroma block keeps its
    // layout, so the padded picture is exact except for the added last row.
    for (int h : {48, 47}) {
        const int w = 64;
        lookref::Nv21Picture even = lookref::makeNv21Picture(w, 48);
        // h luma rows followed by the 24 chroma rows of the 48-row picture.
        std::vector<uint8_t> input(size_t(w) * h + size_t(w) * 24);
        memcpy(input.data(), even.nv21.data(), size_t(w) * h);
        memcpy(input.data() + size_t(w) * h, even.nv21.data() + w * 48, size_t(w) * 24);
        lookref::Picture picture(w, 48, even.rgba);
        for (int id : lookref::lookIds()) {
            ASSERT_EQ(0, mProcessor->setEffect(id));
            std::vector<uint8_t> out(w * 48 * 4, 0x5A);
            ASSERT_EQ(0, mProcessor->doProcessNV21(input.data(), w, h, out.data()));
            // At odd height rows 0..45 see the same neighbourhood as in the full
            // picture (the looks reach one texel up at most; the last row changed).
            lookref::expectLook(id, picture, out.data(), h == 48 ? "NV21" : "odd-height NV21",
                                h == 48 ? -1 : 46);
        }
    }
}

TEST_F(BufferedProcessorTest, OddNv21SizesArePaddedToEven) {
    const int w = 101, h = 75, pw = 102, ph = 76;
    // Luma rows of 101 bytes, then the chroma block the processor copies as is.
    std::vector<uint8_t> input(w * h + pw * ph / 2, 128);
    for (int y = 0; y < h; ++y)
        for (int x = 0; x < w; ++x) input[y * w + x] = static_cast<uint8_t>(16 + (x * 2 + y) % 200);
    // Guard bytes after the padded picture must survive.
    std::vector<uint8_t> out(pw * ph * 4 + 64, 0xEE);
    ASSERT_EQ(0, mProcessor->setEffect(400));
    LogCapture log;
    ASSERT_EQ(0, mProcessor->doProcessNV21(input.data(), w, h, out.data()));
    for (size_t i = pw * ph * 4; i < out.size(); ++i) ASSERT_EQ(0xEE, out[i]) << i;
    // Every padded pixel was written (opaque from the pass-through look).
    for (int i = 0; i < pw * ph; ++i) ASSERT_EQ(255, out[i * 4 + 3]) << i;
    // Neutral chroma: a pixel's grey is its luma (full range) in the first rows.
    for (int x = 0; x < w; ++x) EXPECT_NEAR(input[x], out[x * 4 + 1], 2) << x;
    // No board property: an unknown platform, whose only native input is RGBA.
    EXPECT_TRUE(log.contains(VF_LOG_ERROR,
                             "Input format 'NV21' is not a native format for EglImage: "
                             "Conversion required to NV21"));
    EXPECT_TRUE(log.contains(1,
                             "int VFilterBufferedProcessorImpl::doProcessNV21(const unsigned "
                             "char*, int, int, unsigned char*)"));
}

TEST_F(BufferedProcessorTest, FailedDrawLeavesOutputUntouchedAndReturnsZero) {
    // Wider than any texture llvmpipe can hold: the buffer-backed images cannot
    // be made, so nothing is drawn or read back.
    GLint maxSize = 0;
    ASSERT_EQ(0, mProcessor->bindGLEnvironment());
    glGetIntegerv(GL_MAX_TEXTURE_SIZE, &maxSize);
    mProcessor->unbindGLEnvironment();
    ASSERT_GT(maxSize, 0);
    const int w = maxSize * 2, h = 1;
    std::vector<uint8_t> in(size_t(w) * 4, 9), out(size_t(w) * 4, 0xC3);
    mProcessor->setEffect(403);
    LogCapture log;
    EXPECT_EQ(0, mProcessor->doProcessRGBA(in.data(), w, h, out.data(), VC_FORMAT_RGBA));
    EXPECT_EQ(std::vector<uint8_t>(size_t(w) * 4, 0xC3), out);
    EXPECT_EQ(0u, log.count("EGL: Synchronously waiting for rendering..."));
    // Empty and negative sizes: nothing drawn, nothing written, no crash.
    std::vector<uint8_t> guard(64, 0xC3);
    EXPECT_EQ(0, mProcessor->doProcessRGBA(in.data(), 0, 0, guard.data(), VC_FORMAT_RGBA));
    EXPECT_EQ(0, mProcessor->doProcessRGBA(in.data(), -4, 2, guard.data(), VC_FORMAT_BGRA));
    EXPECT_EQ(-7, mProcessor->doProcessNV21(in.data(), -3, 5, guard.data()));
    EXPECT_EQ(std::vector<uint8_t>(64, 0xC3), guard);
    // The processor is still usable afterwards, and logs the draw and its signature.
    std::vector<uint8_t> small(4 * 4 * 4, 10), smallOut(4 * 4 * 4);
    log.clear();
    EXPECT_EQ(0, mProcessor->doProcessRGBA(small.data(), 4, 4, smallOut.data(), VC_FORMAT_RGBA));
    EXPECT_EQ(245, smallOut[0]);
    EXPECT_EQ(10, smallOut[3]);
    EXPECT_TRUE(log.contains(1,
                             "int VFilterBufferedProcessorImpl::doProcessRGBA(const unsigned "
                             "char*, int, int, unsigned char*, int)"));
    EXPECT_EQ(1u, log.count("EGL: Synchronously waiting for rendering..."));
    // No 8K switch off msm8974.
    for (const std::string& l : log.texts()) EXPECT_EQ(std::string::npos, l.find("8K_TEXTURES"));
}

TEST_F(BufferedProcessorTest, Nv21GoesThroughNv12WhereThePlatformPrefersIt) {
    setenv("KIV_PROP_ro_board_platform", "tavrix3", 1);
    Platform::resetForTesting();
    const int w = 32, h = 24;
    lookref::Nv21Picture nv21 = lookref::makeNv21Picture(w, h);
    std::vector<uint8_t> out(w * h * 4, 0x5A);
    ASSERT_EQ(0, mProcessor->setEffect(401));
    LogCapture log;
    int result = mProcessor->doProcessNV21(nv21.nv21.data(), w, h, out.data());
    unsetenv("KIV_PROP_ro_board_platform");
    Platform::resetForTesting();
    ASSERT_EQ(0, result);
    EXPECT_TRUE(log.contains(VF_LOG_ERROR,
                             "Input format 'NV21' is not a native format for EglImage: "
                             "Conversion required to NV12"));
    lookref::expectLook(401, lookref::Picture(w, h, nv21.rgba), out.data(), "NV21 as NV12");
}

TEST_F(BufferedProcessorTest, DriverFailuresInsideTheCall) {
    const int w = 8, h = 6;
    std::vector<uint8_t> in(w * h * 4, 60), out(w * h * 4, 0xC3);
    lookref::Nv21Picture nv21 = lookref::makeNv21Picture(w, h);
    ASSERT_EQ(0, mProcessor->setEffect(403));
    // The picture cannot be read back: drawn, logged, output untouched, 0.
    LogCapture log;
    GlFault_failPictureReads(2);
    EXPECT_EQ(0, mProcessor->doProcessRGBA(in.data(), w, h, out.data(), VC_FORMAT_BGRA));
    EXPECT_EQ(0, mProcessor->doProcessNV21(nv21.nv21.data(), w, h, out.data()));
    GlFault_failPictureReads(0);
    EXPECT_EQ(std::vector<uint8_t>(w * h * 4, 0xC3), out);
    EXPECT_EQ(2u, log.count("EGL: Synchronously waiting for rendering..."));
    EXPECT_EQ(2u, log.count("EGL: Can't access this FBO's pixels"));
    EXPECT_EQ(2u, log.countPrefix("VC_ERROR_UNKNOWN (-1): core/VFilterBufferedProcessorImpl:"));

    // No program can be made: -7 before anything is drawn.
    log.clear();
    GlFault_failProgramCreations(1);
    EXPECT_EQ(-7, mProcessor->doProcessRGBA(in.data(), w, h, out.data(), VC_FORMAT_RGBA));
    GlFault_failProgramCreations(0);
    EXPECT_EQ(std::vector<uint8_t>(w * h * 4, 0xC3), out);
    EXPECT_TRUE(log.contains(VF_LOG_ERROR, "EGL: Program could not be loaded."));
    // bindGLEnvironment's line and the caller's.
    EXPECT_EQ(2u,
              log.countPrefix("VC_ERROR_INVALID_STATE (-7): core/VFilterBufferedProcessorImpl:"));
    EXPECT_EQ(0u, log.count("EGL: Synchronously waiting for rendering..."));

    // Both were passing: the next call draws the negative look.
    EXPECT_EQ(0, mProcessor->doProcessRGBA(in.data(), w, h, out.data(), VC_FORMAT_RGBA));
    EXPECT_EQ(255 - 60, out[0]);
}

// For an effect that draws by itself each path clears the target itself (the
// pbuffer is not what is read back) and binds it once to draw (once more only
// to build it): a draw that covers nothing leaves opaque black, not the zeros
// of a fresh buffer. (The program's own quad covers every pixel: no clear.)
TEST_F(BufferedProcessorTest, UndrawnPixelsAreTheTargetsOwnOpaqueBlack) {
    const int w = 16, h = 8;
    const std::vector<uint8_t> rgba(w * h * 4, 200), nv21(w * h * 3 / 2, 200);
    std::vector<uint8_t> black;
    for (int i = 0; i < w * h; ++i) black.insert(black.end(), {0, 0, 0, 255});
    ASSERT_EQ(0, mProcessor->setEffect(425));
    for (int path = 0; path < 3; ++path) {
        std::vector<uint8_t> out(w * h * 4, 0x5A);
        GlFault_resetBinds();
        GlFault_skipDraws(1);
        int result = path == 2 ? mProcessor->doProcessNV21(nv21.data(), w, h, out.data())
                               : mProcessor->doProcessRGBA(rgba.data(), w, h, out.data(),
                                                           path ? VC_FORMAT_BGRA : VC_FORMAT_RGBA);
        GlFault_skipDraws(0);
        ASSERT_EQ(0, result) << path;
        EXPECT_EQ(black, out) << path;
        EXPECT_EQ(2, GlFault_bindsOfDrawingContext()) << path;
    }
}

TEST_F(BufferedProcessorTest, NoGlObjectOrMemoryGrowthOverAThousandCalls) {
    const int w = 16, h = 12;
    std::vector<uint8_t> rgba = lookref::makeTestPicture(w, h, false);
    lookref::Nv21Picture nv21 = lookref::makeNv21Picture(w, h);
    std::vector<uint8_t> out(w * h * 4);
    // The fixed looks, and the effects that hold GL objects of their own
    // (colour, geometric, Beauty with a face), with a new parameter text
    // before every draw.
    std::vector<int> ids = lookref::lookIds();
    for (int id = 425; id <= 436; ++id) ids.push_back(id);
    for (int id : {417, 441, 444, 445, 446, 447}) ids.push_back(id);
    auto run = [&](int i) {
        mProcessor->setEffect(ids[i % ids.size()]);
        int n = i % 401 - 200;
        std::string text = "intensity=" + std::to_string(n) + ",highlight=" + std::to_string(-n) +
                           ",TE=" + std::to_string(n) + ",SA=" + std::to_string(n / 2) +
                           ",FA=1,LE=" + std::to_string(n) +
                           ",face=1,width=16,height=12,left=2,top=2,right=12,bottom=10,"
                           "tonemin=3158064,tonemax=16777200";
        mProcessor->setEffectParameter(text.c_str());
        if (i % 3 == 0) mProcessor->setEffect("com.morvane.unknown,libnone.so");
        int r = (i % 2) ? mProcessor->doProcessRGBA(rgba.data(), w, h, out.data(),
                                                    i % 4 == 1 ? VC_FORMAT_BGRA : VC_FORMAT_RGBA)
                        : mProcessor->doProcessNV21(nv21.nv21.data(), w, h, out.data());
        ASSERT_EQ(0, r) << i;
    };
    // Quiet: a thousand draws log a great deal.
    LogCapture quiet;
    for (int i = 0; i < 20; ++i) run(i);
    // Counted during a bind with the same effect loaded (Brightness, with a
    // program and shaders of its own) before and after.
    auto liveDuringBind = [&]() {
        mProcessor->setEffect(431);
        mProcessor->doProcessRGBA(rgba.data(), w, h, out.data(), VC_FORMAT_RGBA);
        EXPECT_EQ(0, mProcessor->bindGLEnvironment());
        int live = GlTest_liveObjects(4096);
        mProcessor->unbindGLEnvironment();
        return live;
    };
    const int before = liveDuringBind();
    const int filesBefore = Test_openFiles();
    for (int i = 20; i < 1020; ++i) {
        run(i);
        if (HasFatalFailure()) return;
    }
    const int after = liveDuringBind();
    // Only what a bind makes is alive each time: the program and its shaders,
    // and the effect's own program and shaders.
    EXPECT_EQ(before, after);
    EXPECT_EQ(filesBefore, Test_openFiles());
    EXPECT_LE(after, 5);
    // Not current after a call: the context is bound only around each draw.
    EXPECT_EQ(EGL_NO_CONTEXT, eglGetCurrentContext());
}
