// The buffered processor end to end on llvmpipe: every fixed look through each
// path (RGBA, BGRA, NV21 of even and odd height, NV21 as NV12) compared with
// the CPU statement of its math, effect fallbacks, status codes and lines
// (also of driver failures injected into the real GL), buffers of its own per
// call, and GL objects and memory over many calls.
#include <EGL/egl.h>
#include <GLES2/gl2.h>
#include <gtest/gtest.h>

#include <cstdlib>
#include <cstring>
#include <functional>
#include <string>
#include <vector>

#include "core/KivFilter.h"
#include "core/VFilterBufferedProcessor.h"
#include "core/VFilterBufferedProcessorImpl.h"
#include "core/egl/Platform.h"
#include "support/gl_context.h"
#include "support/gl_fault.h"
#include "support/log_capture.h"
#include "support/look_reference.h"
#include "support/open_files.h"
#include "support/processor_ptr.h"

namespace {

using Bytes = std::vector<uint8_t>;

Bytes swapRB(Bytes in) {
    for (size_t i = 0; i < in.size(); i += 4) std::swap(in[i], in[i + 2]);
    return in;
}

class BufferedProcessorTest : public ::testing::Test {
protected:
    void SetUp() override { mProcessor = ProcessorTest_create(); }
    int rgba(const Bytes& in, int w, int h, Bytes& out, uint32_t format = VC_FORMAT_RGBA) {
        return mProcessor->doProcessRGBA(in.data(), w, h, out.data(), format);
    }
    ProcessorPtr mProcessor;
};

TEST(BufferedProcessorApi, CreateDestroyAndEffectSelection) {
    EXPECT_EQ(3, BufferedProcessor_GetVersion());
    VFilterBufferedProcessor* created = BufferedProcessor_Create();
    ASSERT_NE(nullptr, dynamic_cast<VFilterBufferedProcessorImpl*>(created));
    EXPECT_TRUE(pthread_equal(pthread_self(), gOpenGLManagerThread));
    BufferedProcessor_Destroy(created);
    EXPECT_EQ(0u, static_cast<unsigned long>(gOpenGLManagerThread));
    BufferedProcessor_Destroy(nullptr);
    LogCapture quiet;
    VFilterBufferedProcessorImpl p;
    EXPECT_EQ(0, p.setEffectParameter("intensity=3"));  // nothing held: nothing happens
    EXPECT_EQ(nullptr, p.getEffect());
    // Unknown ids fall back to the pass-through look; an unknown library name
    // is a downloadable filter (without a plug-in here); a built-in library
    // name that has no effect here falls back too.
    const struct {
        std::function<int()> set;
        int type;
    } rows[] = {
        // Each row follows an effect of another type, so that keeping the
        // old effect cannot pass for the fallback.
        // clang-format off
        {[&] { return p.setEffect(401); }, 401},
        {[&] { return p.setEffect(-1); }, 400},
        {[&] { return p.setEffect("no.such.package,libnothing.so"); }, 2000},
        {[&] { return p.setEffect(404); }, 400},
        {[&] { return p.setEffect(443) + p.setEffectParameter("intensity=3"); }, 443},
        {[&] { return p.setEffect(1999); }, 400},
        {[&] { return p.setEffect(401); }, 401},
        {[&] { return p.setEffect("com.morvane.android.provider.filterprovider,libfilm.so"); }, 400},
        {[&] { return p.setEffect(401); }, 401},
        {[&] { return p.setEffect(static_cast<const char*>(nullptr)); }, 400},
        // clang-format on
    };
    for (const auto& r : rows) {
        EXPECT_EQ(0, r.set());
        ASSERT_NE(nullptr, p.getEffect());
        EXPECT_EQ(r.type, p.getEffect()->getFilterType());
    }
    EXPECT_EQ(0, p.release());
}

// Bad arguments and a processor never initialised: statuses, their lines
// (bindGLEnvironment's and the caller's), and the output untouched.
TEST(BufferedProcessorApi, StatusCodesWithoutContextOrBuffers) {
    VFilterBufferedProcessorImpl p;
    Bytes in(16 * 4, 7), out(16 * 4, 0xAB);
    const std::string kState = "E VC_ERROR_INVALID_STATE (-7): core/VFilterBufferedProcessorImpl:#";
    LogCapture_expectRows({
        {[&] { return p.doProcessRGBA(nullptr, 4, 4, out.data(), VC_FORMAT_RGBA); }, -3, {}},
        {[&] { return p.doProcessRGBA(in.data(), 4, 4, nullptr, VC_FORMAT_BGRA); }, -3, {}},
        {[&] { return p.doProcessNV21(nullptr, 4, 4, out.data()); }, -3, {}},
        {[&] { return p.doProcessNV21(in.data(), 4, 4, nullptr); }, -3, {}},
        {[&] { return p.doProcessRGBA(in.data(), 4, 4, out.data(), VC_FORMAT_RGBA); },
         -7,
         {kState, kState}},
        {[&] { return p.doProcessNV21(in.data(), 4, 4, out.data()); }, -7, {kState, kState}},
    });
    EXPECT_EQ(Bytes(16 * 4, 0xAB), out);
}

// Odd RGBA sizes on purpose: no symmetry can hide a row or column mix-up.
// 64x47 NV21 is padded to 64x48: with an even width the chroma block keeps
// its layout, so rows 0..45 see the same neighbourhood as in the full picture
// (the looks reach one texel up at most; the last row changed).
enum Path { RGBA, BGRA, NV21, NV21_ODD_HEIGHT, NV21_AS_NV12 };

class EveryLook : public BufferedProcessorTest, public ::testing::WithParamInterface<Path> {};

TEST_P(EveryLook, MatchesItsCpuStatement) {
    const Path path = GetParam();
    const bool nv21 = path >= NV21;
    const int w = nv21 ? 64 : 61, h = nv21 ? 48 : 47, rows = path == NV21_ODD_HEIGHT ? 46 : -1;
    if (path == NV21_AS_NV12) setenv("KIV_PROP_ro_board_platform", "tavrix3", 1);
    Platform::resetForTesting();
    lookref::Nv21Picture yuv = nv21 ? lookref::makeNv21Picture(w, h) : lookref::Nv21Picture();
    lookref::Picture picture(w, h, nv21 ? yuv.rgba : lookref::makeTestPicture(w, h, false));
    Bytes input = path == BGRA ? swapRB(picture.rgba()) : nv21 ? yuv.nv21 : picture.rgba();
    if (path == NV21_ODD_HEIGHT) input.erase(input.begin() + w * 47, input.begin() + w * 48);
    LogCapture log;
    for (int id : lookref::lookIds()) {
        ASSERT_EQ(0, mProcessor->setEffect(id));
        Bytes out(w * h * 4, 0x5A);
        ASSERT_EQ(0, nv21 ? mProcessor->doProcessNV21(input.data(), w, h - (rows > 0), out.data())
                          : rgba(input, w, h, out, path == BGRA ? VC_FORMAT_BGRA : VC_FORMAT_RGBA));
        lookref::expectLook(id, picture, (path == BGRA ? swapRB(out) : out).data(),
                            std::to_string(path), rows);
    }
    unsetenv("KIV_PROP_ro_board_platform");
    Platform::resetForTesting();
    // Without a board property the only native input is RGBA; tavrix3 prefers NV12.
    if (nv21) {
        EXPECT_TRUE(
            log.contains(VF_LOG_ERROR, std::string("Input format 'NV21' is not a native format for "
                                                   "EglImage: Conversion required to ") +
                                           (path == NV21_AS_NV12 ? "NV12" : "NV21")));
    }
}

INSTANTIATE_TEST_SUITE_P(Paths, EveryLook,
                         ::testing::Values(RGBA, BGRA, NV21, NV21_ODD_HEIGHT, NV21_AS_NV12));

TEST_F(BufferedProcessorTest, OddNv21SizesArePaddedToEven) {
    const int w = 101, h = 75, pw = 102, ph = 76;
    // Luma rows of 101 bytes, then the chroma block the processor copies as is.
    Bytes input(w * h + pw * ph / 2, 128);
    for (int y = 0; y < h; ++y)
        for (int x = 0; x < w; ++x) input[y * w + x] = static_cast<uint8_t>(16 + (x * 2 + y) % 200);
    Bytes out(pw * ph * 4 + 64, 0xEE);  // guard bytes after the padded picture must survive
    ASSERT_EQ(0, mProcessor->setEffect(400));
    ASSERT_EQ(0, mProcessor->doProcessNV21(input.data(), w, h, out.data()));
    EXPECT_EQ(Bytes(64, 0xEE), Bytes(out.end() - 64, out.end()));
    // Every padded pixel written (opaque from the pass-through look); neutral
    // chroma: every pixel's grey is its luma (full range), up to the last row.
    for (int i = 0; i < pw * ph; ++i) ASSERT_EQ(255, out[i * 4 + 3]) << i;
    for (int y = 0; y < h; ++y)
        for (int x = 0; x < w; ++x)
            ASSERT_NEAR(input[y * w + x], out[(y * pw + x) * 4 + 1], 2) << x << "," << y;
}

// Wider than any texture llvmpipe can hold, empty or negative: nothing drawn
// or written, 0 (or -7 for NV21 that cannot be padded); usable afterwards.
TEST_F(BufferedProcessorTest, FailedDrawLeavesOutputUntouchedAndReturnsZero) {
    GLint maxSize = 0;
    ASSERT_EQ(0, mProcessor->bindGLEnvironment());
    glGetIntegerv(GL_MAX_TEXTURE_SIZE, &maxSize);
    mProcessor->unbindGLEnvironment();
    ASSERT_GT(maxSize, 0);
    Bytes in(size_t(maxSize) * 8, 9), out(size_t(maxSize) * 8, 0xC3), guard(64, 0xC3);
    mProcessor->setEffect(403);
    LogCapture log;
    EXPECT_EQ(0, rgba(in, maxSize * 2, 1, out));
    EXPECT_EQ(0, rgba(in, 0, 0, guard));
    EXPECT_EQ(0, rgba(in, -4, 2, guard, VC_FORMAT_BGRA));
    EXPECT_EQ(-7, mProcessor->doProcessNV21(in.data(), -3, 5, guard.data()));
    EXPECT_EQ(Bytes(size_t(maxSize) * 8, 0xC3), out);
    EXPECT_EQ(Bytes(64, 0xC3), guard);
    EXPECT_EQ(0u, log.count("EGL: Synchronously waiting for rendering..."));
    Bytes small(4 * 4 * 4, 10), smallOut(4 * 4 * 4);
    EXPECT_EQ(0, rgba(small, 4, 4, smallOut));
    EXPECT_EQ(Bytes({245, 245, 245, 10}), Bytes(smallOut.begin(), smallOut.begin() + 4));
    EXPECT_EQ(1u, log.count("EGL: Synchronously waiting for rendering..."));
    EXPECT_EQ(0u, log.countPrefix("EGL: Enable GL_ENABLE_8K"));  // only on msm8974
}

TEST_F(BufferedProcessorTest, DriverFailuresInsideTheCall) {
    const int w = 8, h = 6;
    Bytes in(w * h * 4, 60), out(w * h * 4, 0xC3);
    lookref::Nv21Picture nv21 = lookref::makeNv21Picture(w, h);
    ASSERT_EQ(0, mProcessor->setEffect(403));
    // The picture cannot be read back: drawn, logged, output untouched, 0.
    LogCapture log;
    GlFault_failPictureReads(2);
    EXPECT_EQ(0, rgba(in, w, h, out, VC_FORMAT_BGRA));
    EXPECT_EQ(0, mProcessor->doProcessNV21(nv21.nv21.data(), w, h, out.data()));
    GlFault_failPictureReads(0);
    EXPECT_EQ(2u, log.count("EGL: Synchronously waiting for rendering..."));
    EXPECT_EQ(2u, log.count("EGL: Can't access this FBO's pixels"));
    EXPECT_EQ(2u, log.countPrefix("VC_ERROR_UNKNOWN (-1): core/VFilterBufferedProcessorImpl:"));
    // No program can be made: -7 before anything is drawn.
    log.clear();
    GlFault_failProgramCreations(1);
    EXPECT_EQ(-7, rgba(in, w, h, out));
    GlFault_failProgramCreations(0);
    EXPECT_EQ(Bytes(w * h * 4, 0xC3), out);
    EXPECT_TRUE(log.matches(
        {"E Could not create a new program", "E VC_ERROR_UNKNOWN (-1): core/egl/EglShader:#",
         "E VC_ERROR_ALLOC_FAILED (-5): core/egl/EglProgram:#",
         "E EGL: Program could not be loaded.",
         "E VC_ERROR_INVALID_STATE (-7): core/VFilterBufferedProcessorImpl:#",
         "E VC_ERROR_INVALID_STATE (-7): core/VFilterBufferedProcessorImpl:#"}));
    // Both were passing: the next call draws the negative look.
    EXPECT_EQ(0, rgba(in, w, h, out));
    EXPECT_EQ(255 - 60, out[0]);
}

// For an effect that draws by itself each path clears the target itself (the
// pbuffer is not what is read back): a draw that covers nothing leaves opaque
// black, not the zeros of a fresh buffer.
TEST_F(BufferedProcessorTest, UndrawnPixelsAreTheTargetsOwnOpaqueBlack) {
    const int w = 16, h = 8;
    const Bytes pixels(w * h * 4, 200), nv21(w * h * 3 / 2, 200);
    Bytes black;
    for (int i = 0; i < w * h; ++i) black.insert(black.end(), {0, 0, 0, 255});
    ASSERT_EQ(0, mProcessor->setEffect(425));
    for (int path = 0; path < 3; ++path) {
        Bytes out(w * h * 4, 0x5A);
        GlFault_skipDraws(1);
        int result = path == 2 ? mProcessor->doProcessNV21(nv21.data(), w, h, out.data())
                               : rgba(pixels, w, h, out, path ? VC_FORMAT_BGRA : VC_FORMAT_RGBA);
        GlFault_skipDraws(0);
        ASSERT_EQ(0, result) << path;
        EXPECT_EQ(black, out) << path;
    }
}

// No buffers are kept between calls: each call creates its own source and
// target (and says so) and gets its own picture back, whatever the sizes in
// between, even where the host recycles buffer memory.
TEST_F(BufferedProcessorTest, EveryCallHasItsOwnBuffersAndPicture) {
    mProcessor->setEffect(400);
    const int sizes[][2] = {{16, 8}, {16, 8}, {10, 4}, {16, 8}};
    LogCapture log;
    int seed = 0;
    for (const auto& s : sizes) {
        Bytes in(size_t(s[0]) * s[1] * 4), out(in.size(), 0);
        for (size_t i = 0; i < in.size(); ++i) in[i] = i % 4 == 3 ? 255 : uint8_t(i * 7 + ++seed);
        EXPECT_EQ(0, rgba(in, s[0], s[1], out));
        EXPECT_EQ(in, out) << s[0] << "x" << s[1] << " call " << seed;
    }
    for (std::string size : {"16x8", "10x4"}) {
        const size_t calls = size == "16x8" ? 3 : 1;
        const std::string head = "EglImage: Creating GraphicBuffer " + size;
        EXPECT_EQ(log.count(head + " RGBA (format 1, usage 0x00000133)"), calls);  // sources
        EXPECT_EQ(log.count(head + " RGBA (format 1, usage 0x00000333)"), calls);  // targets
    }
}

TEST_F(BufferedProcessorTest, NoGlObjectOrMemoryGrowthOverAThousandCalls) {
    const int w = 16, h = 12;
    Bytes pixels = lookref::makeTestPicture(w, h, false), out(w * h * 4);
    lookref::Nv21Picture nv21 = lookref::makeNv21Picture(w, h);
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
        return (i % 2) ? rgba(pixels, w, h, out, i % 4 == 1 ? VC_FORMAT_BGRA : VC_FORMAT_RGBA)
                       : mProcessor->doProcessNV21(nv21.nv21.data(), w, h, out.data());
    };
    LogCapture quiet;  // a thousand draws log a great deal
    for (int i = 0; i < 20; ++i) ASSERT_EQ(0, run(i)) << i;
    // Counted during a bind with the same effect loaded (Brightness, with a
    // program and shaders of its own) before and after: only what a bind makes.
    auto liveDuringBind = [&]() {
        mProcessor->setEffect(431);
        rgba(pixels, w, h, out);
        EXPECT_EQ(0, mProcessor->bindGLEnvironment());
        int live = GlTest_liveObjects(4096);
        mProcessor->unbindGLEnvironment();
        return live;
    };
    const int before = liveDuringBind(), filesBefore = Test_openFiles();
    for (int i = 20; i < 1020; ++i) ASSERT_EQ(0, run(i)) << i;
    EXPECT_EQ(before, liveDuringBind());
    EXPECT_LE(before, 5);
    EXPECT_EQ(filesBefore, Test_openFiles());
    // Not current after a call: the context is bound only around each draw.
    EXPECT_EQ(EGL_NO_CONTEXT, eglGetCurrentContext());
}

}  // namespace
