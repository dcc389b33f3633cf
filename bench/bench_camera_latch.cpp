// 1920x1080 NV21 camera frames through a camera source window: the virtual
// camera writes each frame into the window's buffer queue, the window
// latches it into its external texture and the library's program samples it
// once through the default external shader into a frame-sized target. The
// peer is the bare GL work of the same size done here: the image core's
// NV21->RGBA conversion, glTexSubImage2D into a 2D texture and the same draw
// (the default shader's 2D twin, compiled as the platform compiles the
// library's shaders). Both sides finish the GPU work (glFinish) and take
// turns frame by frame, so load from elsewhere on the machine falls on both.
#include <EGL/egl.h>
#include <GLES2/gl2.h>
#include <GLES2/gl2ext.h>
#include <android/log.h>
#include <benchmark/benchmark.h>
#include <stdio.h>
#include <stdlib.h>

#include <algorithm>
#include <chrono>
#include <memory>
#include <string>
#include <vector>

#include "bench_common.h"
#include "bench_gl.h"
#include "core/egl/EglEnvironment.h"
#include "core/egl/EglNativeSeam.h"
#include "core/egl/EglProgram.h"
#include "core/egl/EglShader.h"
#include "core/egl/EglWindow.h"
#include "core/egl/EglWindowSurface.h"
#include "kivhost/VirtualCamera.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_log.h"

namespace {

using namespace kivbench;

constexpr int kWidth = 1920;
constexpr int kHeight = 1080;
constexpr int kRuns = 40;

std::vector<double> gOurs, gBare;
bool gWrongFrame = false;

GLuint makeTarget(GLuint* texture) {
    glGenTextures(1, texture);
    glBindTexture(GL_TEXTURE_2D, *texture);
    glTexImage2D(GL_TEXTURE_2D, 0, GL_RGBA, kWidth, kHeight, 0, GL_RGBA, GL_UNSIGNED_BYTE, nullptr);
    GLuint framebuffer = 0;
    glGenFramebuffers(1, &framebuffer);
    glBindFramebuffer(GL_FRAMEBUFFER, framebuffer);
    glFramebufferTexture2D(GL_FRAMEBUFFER, GL_COLOR_ATTACHMENT0, GL_TEXTURE_2D, *texture, 0);
    return framebuffer;
}

// The bare side: conversion, upload and the same draw, nothing around them.
class Bare {
public:
    bool open() {
        mProgram = quadProgram(EglProgram::kDefaultFragmentShader2D);
        const bool linked = mProgram != 0;
        glGenTextures(1, &mSource);
        glBindTexture(GL_TEXTURE_2D, mSource);
        glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MIN_FILTER, GL_LINEAR);
        glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MAG_FILTER, GL_LINEAR);
        glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_S, GL_CLAMP_TO_EDGE);
        glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_T, GL_CLAMP_TO_EDGE);
        glTexImage2D(GL_TEXTURE_2D, 0, GL_RGBA, kWidth, kHeight, 0, GL_RGBA, GL_UNSIGNED_BYTE,
                     nullptr);
        mFramebuffer = makeTarget(&mTarget);
        mRgba.resize((size_t)kWidth * kHeight * 4);
        return linked && glCheckFramebufferStatus(GL_FRAMEBUFFER) == GL_FRAMEBUFFER_COMPLETE;
    }

    void close() {
        glDeleteFramebuffers(1, &mFramebuffer);
        glDeleteTextures(1, &mTarget);
        glDeleteTextures(1, &mSource);
        glDeleteProgram(mProgram);
    }

    bool frame(const std::vector<unsigned char>& nv21) {
        VCImage* in = VCImage_createWrap(const_cast<unsigned char*>(nv21.data()), kWidth, kHeight,
                                         VC_FORMAT_NV21, 0, 0);
        VCImage* out = VCImage_createWrap(mRgba.data(), kWidth, kHeight, VC_FORMAT_RGBA, 0, 0);
        const bool converted = VCImage_convert(in, out) == 0;
        VCImage_destroy(in);
        VCImage_destroy(out);
        static const GLfloat uv[] = {0, 0, 1, 0, 0, 1, 1, 1};
        glActiveTexture(GL_TEXTURE0);
        glBindTexture(GL_TEXTURE_2D, mSource);
        glPixelStorei(GL_UNPACK_ALIGNMENT, 4);
        glTexSubImage2D(GL_TEXTURE_2D, 0, 0, 0, kWidth, kHeight, GL_RGBA, GL_UNSIGNED_BYTE,
                        mRgba.data());
        glBindFramebuffer(GL_FRAMEBUFFER, mFramebuffer);
        drawQuad(mProgram, kWidth, kHeight, uv);
        glFinish();
        return converted && glGetError() == GL_NO_ERROR;
    }

private:
    GLuint mProgram = 0, mSource = 0, mTarget = 0, mFramebuffer = 0;
    std::vector<unsigned char> mRgba;
};

void BM_CameraLatch_Interleaved(benchmark::State& state) {
    android::sp<EglEnvironment> env = new EglEnvironment();
    android::sp<EglWindowSurface> pbuffer = new EglWindowSurface(env);
    if (env->initialize() != 0 || pbuffer->initialize() != 0 || pbuffer->bindSurface() != 0) {
        state.SkipWithError("no EGL context");
        return;
    }
    Bare bare;
    android::sp<EglWindow> window = new EglWindow(0, kWidth, kHeight);
    android::sp<EglProgram> program = new EglProgram();
    kivhost::VirtualCamera camera(kivhost::VirtualCamera_generator(kWidth, kHeight), kWidth,
                                  kHeight);
    GLuint targetTexture = 0, target = 0;
    bool ready =
        bare.open() && window->initialize() == 0 && camera.connect(window->getANativeWindow()) == 0;
    target = makeTarget(&targetTexture);
    program->setCameraGeometryType(EglProgram::GEOMETRY_NORMAL, 0);
    ready = ready && program->initialize(10, false) == 0;
    program->setCameraGeometry(kWidth, kHeight, 0, 0);
    program->setPreviewGeometry(kWidth, kHeight, false);
    // The frames the camera sends, for the bare side to start from.
    std::vector<std::vector<unsigned char>> frames;
    for (int i = 0; ready && i < 4; ++i) {
        frames.emplace_back(VCImage_requiredSize(kWidth, kHeight, VC_FORMAT_NV21));
        VCImage* frame =
            VCImage_createWrap(frames.back().data(), kWidth, kHeight, VC_FORMAT_NV21, 0, 0);
        kivhost::VirtualCamera_generator(kWidth, kHeight)->render(i, frame);
        VCImage_destroy(frame);
    }
    using Clock = std::chrono::steady_clock;
    uint64_t index = 0;
    for (auto _ : state) {
        if (!ready) {
            state.SkipWithError("cannot set up the window, the camera or the program");
            break;
        }
        auto start = Clock::now();
        bool ok = camera.queueFrame() == 0 && window->updateTexImage() == 0;
        glBindFramebuffer(GL_FRAMEBUFFER, target);
        glActiveTexture(GL_TEXTURE0);
        glBindTexture(GL_TEXTURE_EXTERNAL_OES, window->getTexture());
        ok = ok && program->onDrawFrame() == 0;
        glFinish();
        auto ours = Clock::now();
        ok = ok && bare.frame(frames[index % frames.size()]);
        auto done = Clock::now();
        if (!ok) {
            state.SkipWithError("a frame failed");
            break;
        }
        gOurs.push_back(std::chrono::duration<double>(ours - start).count());
        gBare.push_back(std::chrono::duration<double>(done - ours).count());
        // The frame drawn must be the frame just queued.
        std::vector<unsigned char> probe((size_t)kWidth * kHeight * 4);
        if (index % 8 == 0) {
            glBindFramebuffer(GL_FRAMEBUFFER, target);
            glReadPixels(0, 0, kWidth, kHeight, GL_RGBA, GL_UNSIGNED_BYTE, probe.data());
            if (kivhost::VirtualCamera_decodeFrameNumber(probe.data(), kWidth, kHeight, false) !=
                (int64_t)index) {
                gWrongFrame = true;
                state.SkipWithError("the latched frame is not the one queued");
                break;
            }
        }
        ++index;
    }
    camera.disconnect();
    program->release();
    window->release();
    bare.close();
    glDeleteFramebuffers(1, &target);
    glDeleteTextures(1, &targetTexture);
    pbuffer->unbindSurface();
    pbuffer->release();
    env->release();
}

BENCHMARK(BM_CameraLatch_Interleaved)
    ->Iterations(kRuns)
    ->Unit(benchmark::kMillisecond)
    ->UseRealTime();

}  // namespace

int main(int argc, char** argv) {
    quietHeadless();
    benchmark::Initialize(&argc, argv);
    benchmark::RunSpecifiedBenchmarks();
    benchmark::Shutdown();
    if (gOurs.empty() || gBare.empty() || gWrongFrame) {
        fprintf(stderr, "bench_camera_latch: a side did not run or showed the wrong frame\n");
        return 1;
    }
    auto range = [](std::vector<double> v) {
        std::sort(v.begin(), v.end());
        return std::make_pair(v.front() * 1e3, v.back() * 1e3);
    };
    const auto oursRange = range(gOurs), bareRange = range(gBare);
    printf(
        "camera_latch %dx%d NV21: ours %.2f ms (%.2f-%.2f), bare GL %.2f ms (%.2f-%.2f), median of "
        "%zu\n",
        kWidth, kHeight, median(gOurs) * 1e3, oursRange.first, oursRange.second,
        median(gBare) * 1e3, bareRange.first, bareRange.second, gOurs.size());
    printf("ratio camera_latch ours/bare = %.2f (target <= 1.1)\n", median(gOurs) / median(gBare));
    return 0;
}
