// A 1920x1080 RGBA buffer through NoEffect (400) with doProcessRGBA, against
// the bare GL work of the same size done here on a context of our own: upload
// with glTexImage2D, one draw of a pass-through program into a framebuffer,
// glReadPixels of the whole frame. The source is sampled with linear
// filtering, as the library's images are, so that both sides do the same GPU
// work and the ratio is the processor's overhead. (A nearest-filtered copy is
// a cheaper draw on llvmpipe: about 40% of ours at this size.) The two sides
// alternate call by call, so load from elsewhere on the machine falls on both.
#include <EGL/egl.h>
#include <GLES2/gl2.h>
#include <android/log.h>
#include <benchmark/benchmark.h>
#include <stdio.h>
#include <stdlib.h>

#include <algorithm>
#include <chrono>
#include <vector>

#include "bench_common.h"
#include "core/VFilterBufferedProcessorImpl.h"
#include "vccore/vc_image.h"
#include "vccore/vc_log.h"

namespace {

using namespace kivbench;

constexpr int kWidth = 1920;
constexpr int kHeight = 1080;
constexpr int kRuns = 20;

std::vector<unsigned char> gInput, gOutput;
std::vector<double> gOurs, gBare;
// Part of every call: building and tearing down the effect's program.
std::vector<double> gProgram;
bool gWrongOutput = false;

// Largest byte difference; the pass-through must give back what went in.
int maxDifference(const std::vector<unsigned char>& a, const std::vector<unsigned char>& b) {
    int worst = a.size() == b.size() ? 0 : 256;
    for (size_t i = 0; i < a.size() && i < b.size(); i++) worst = std::max(worst, abs(a[i] - b[i]));
    return worst;
}

// The same GPU pass, with nothing around it.
class BareGl {
public:
    bool open() {
        mDisplay = eglGetDisplay(EGL_DEFAULT_DISPLAY);
        if (mDisplay == EGL_NO_DISPLAY || !eglInitialize(mDisplay, nullptr, nullptr)) return false;
        const EGLint attribs[] = {EGL_RENDERABLE_TYPE,
                                  EGL_OPENGL_ES2_BIT,
                                  EGL_SURFACE_TYPE,
                                  EGL_PBUFFER_BIT,
                                  EGL_RED_SIZE,
                                  8,
                                  EGL_GREEN_SIZE,
                                  8,
                                  EGL_BLUE_SIZE,
                                  8,
                                  EGL_ALPHA_SIZE,
                                  8,
                                  EGL_NONE};
        EGLConfig config;
        EGLint count = 0;
        if (!eglChooseConfig(mDisplay, attribs, &config, 1, &count) || count < 1) return false;
        const EGLint contextAttribs[] = {EGL_CONTEXT_CLIENT_VERSION, 2, EGL_NONE};
        mContext = eglCreateContext(mDisplay, config, EGL_NO_CONTEXT, contextAttribs);
        const EGLint surfaceAttribs[] = {EGL_WIDTH, 1, EGL_HEIGHT, 1, EGL_NONE};
        mSurface = eglCreatePbufferSurface(mDisplay, config, surfaceAttribs);
        if (mContext == EGL_NO_CONTEXT || mSurface == EGL_NO_SURFACE) return false;
        if (!makeCurrent()) return false;
        return buildProgram() && buildTargets();
    }

    bool makeCurrent() { return eglMakeCurrent(mDisplay, mSurface, mSurface, mContext); }

    void close() {
        if (mDisplay == EGL_NO_DISPLAY) return;
        if (mContext != EGL_NO_CONTEXT) {
            eglMakeCurrent(mDisplay, mSurface, mSurface, mContext);
            glDeleteFramebuffers(1, &mFramebuffer);
            glDeleteTextures(1, &mTarget);
            glDeleteTextures(1, &mSource);
            glDeleteProgram(mProgram);
        }
        eglMakeCurrent(mDisplay, EGL_NO_SURFACE, EGL_NO_SURFACE, EGL_NO_CONTEXT);
        if (mSurface != EGL_NO_SURFACE) eglDestroySurface(mDisplay, mSurface);
        if (mContext != EGL_NO_CONTEXT) eglDestroyContext(mDisplay, mContext);
    }

    // One frame: upload, draw, read back. False on any GL error.
    bool frame(const unsigned char* input, unsigned char* output) {
        glBindTexture(GL_TEXTURE_2D, mSource);
        glTexImage2D(GL_TEXTURE_2D, 0, GL_RGBA, kWidth, kHeight, 0, GL_RGBA, GL_UNSIGNED_BYTE,
                     input);
        glBindFramebuffer(GL_FRAMEBUFFER, mFramebuffer);
        glViewport(0, 0, kWidth, kHeight);
        glUseProgram(mProgram);
        glDrawArrays(GL_TRIANGLE_STRIP, 0, 4);
        glReadPixels(0, 0, kWidth, kHeight, GL_RGBA, GL_UNSIGNED_BYTE, output);
        return glGetError() == GL_NO_ERROR;
    }

private:
    bool buildProgram() {
        const char* vs =
            "attribute vec2 a_pos; varying vec2 v_uv;\n"
            "void main() { v_uv = a_pos * 0.5 + 0.5; gl_Position = vec4(a_pos, 0.0, 1.0); }\n";
        const char* fs =
            "precision mediump float; uniform sampler2D s; varying vec2 v_uv;\n"
            "void main() { gl_FragColor = texture2D(s, v_uv); }\n";
        GLuint v = compile(GL_VERTEX_SHADER, vs), f = compile(GL_FRAGMENT_SHADER, fs);
        if (v == 0 || f == 0) return false;
        mProgram = glCreateProgram();
        glAttachShader(mProgram, v);
        glAttachShader(mProgram, f);
        glBindAttribLocation(mProgram, 0, "a_pos");
        glLinkProgram(mProgram);
        glDeleteShader(v);
        glDeleteShader(f);
        GLint linked = 0;
        glGetProgramiv(mProgram, GL_LINK_STATUS, &linked);
        if (!linked) return false;
        // Done compiling. Holding on to the compiler would keep Mesa's GLSL
        // built-ins loaded for the processor's context too, which no real
        // caller of it has.
        glReleaseShaderCompiler();
        static const GLfloat quad[] = {-1, -1, 1, -1, -1, 1, 1, 1};
        glVertexAttribPointer(0, 2, GL_FLOAT, GL_FALSE, 0, quad);
        glEnableVertexAttribArray(0);
        return true;
    }

    static GLuint compile(GLenum type, const char* source) {
        GLuint s = glCreateShader(type);
        glShaderSource(s, 1, &source, nullptr);
        glCompileShader(s);
        GLint ok = 0;
        glGetShaderiv(s, GL_COMPILE_STATUS, &ok);
        if (!ok) {
            glDeleteShader(s);
            return 0;
        }
        return s;
    }

    bool buildTargets() {
        glGenTextures(1, &mSource);
        glBindTexture(GL_TEXTURE_2D, mSource);
        glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MIN_FILTER, GL_LINEAR);
        glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MAG_FILTER, GL_LINEAR);
        glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_S, GL_CLAMP_TO_EDGE);
        glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_T, GL_CLAMP_TO_EDGE);
        glGenTextures(1, &mTarget);
        glBindTexture(GL_TEXTURE_2D, mTarget);
        glTexImage2D(GL_TEXTURE_2D, 0, GL_RGBA, kWidth, kHeight, 0, GL_RGBA, GL_UNSIGNED_BYTE,
                     nullptr);
        glGenFramebuffers(1, &mFramebuffer);
        glBindFramebuffer(GL_FRAMEBUFFER, mFramebuffer);
        glFramebufferTexture2D(GL_FRAMEBUFFER, GL_COLOR_ATTACHMENT0, GL_TEXTURE_2D, mTarget, 0);
        return glCheckFramebufferStatus(GL_FRAMEBUFFER) == GL_FRAMEBUFFER_COMPLETE;
    }

    EGLDisplay mDisplay = EGL_NO_DISPLAY;
    EGLContext mContext = EGL_NO_CONTEXT;
    EGLSurface mSurface = EGL_NO_SURFACE;
    GLuint mProgram = 0, mSource = 0, mTarget = 0, mFramebuffer = 0;
};

// Ours and the bare pass take turns, one call each per iteration, so that a
// change in the machine's load reaches both sides alike.
void BM_NoEffectRgba_Interleaved(benchmark::State& state) {
    BareGl gl;
    if (!gl.open()) {
        state.SkipWithError("cannot set up the bare GL context");
        gl.close();
        return;
    }
    auto* processor = static_cast<VFilterBufferedProcessorImpl*>(BufferedProcessor_Create());
    processor->initialize();
    processor->setEffect(400);
    std::vector<unsigned char> bareOutput(gInput.size());
    using Clock = std::chrono::steady_clock;
    for (auto _ : state) {
        gl.makeCurrent();
        auto start = Clock::now();
        bool ok = gl.frame(gInput.data(), bareOutput.data());
        auto bare = Clock::now();
        int rc = processor->doProcessRGBA(gInput.data(), kWidth, kHeight, gOutput.data(),
                                          VC_FORMAT_RGBA);
        auto ours = Clock::now();
        if (!ok || rc != VC_OK) {
            state.SkipWithError(ok ? "doProcessRGBA failed" : "GL error in the bare frame");
            break;
        }
        gBare.push_back(std::chrono::duration<double>(bare - start).count());
        gOurs.push_back(std::chrono::duration<double>(ours - bare).count());
    }
    // Pass-through: a wrong result would make the timing meaningless.
    if (maxDifference(bareOutput, gInput) > 1) {
        state.SkipWithError("the bare copy did not reproduce its input");
        gWrongOutput = true;
    } else if (maxDifference(gOutput, gInput) > 1) {
        state.SkipWithError("NoEffect did not reproduce its input");
        gWrongOutput = true;
    }
    // What bindGLEnvironment/unbindGLEnvironment cost per call (the program
    // is compiled and linked afresh every time), to explain the ratio.
    for (int i = 0; i < kRuns; i++) {
        auto start = Clock::now();
        int rc = processor->bindGLEnvironment();
        processor->unbindGLEnvironment();
        if (rc != VC_OK) break;
        gProgram.push_back(std::chrono::duration<double>(Clock::now() - start).count());
    }
    processor->release();
    BufferedProcessor_Destroy(processor);
    gl.close();
}

BENCHMARK(BM_NoEffectRgba_Interleaved)
    ->Iterations(kRuns)
    ->Unit(benchmark::kMillisecond)
    ->UseRealTime();

}  // namespace

int main(int argc, char** argv) {
    // Per-call debug lines would be timed too; errors still show.
    quietHeadless();

    gInput.resize(static_cast<size_t>(kWidth) * kHeight * 4);
    gOutput.assign(gInput.size(), 0);
    uint32_t seed = 7;
    for (unsigned char& b : gInput) {
        seed = seed * 1664525u + 1013904223u;
        b = static_cast<unsigned char>(seed >> 24);
    }

    benchmark::Initialize(&argc, argv);
    benchmark::RunSpecifiedBenchmarks();
    benchmark::Shutdown();

    if (gOurs.empty() || gBare.empty() || gWrongOutput) {
        fprintf(stderr,
                "bench_noeffect_rgba: a side did not run or gave a wrong picture; no ratio\n");
        return 1;
    }
    double ours = median(gOurs), bare = median(gBare);
    printf("noeffect_rgba %dx%d: ours %.2f ms, bare GL %.2f ms (median of %d)\n", kWidth, kHeight,
           ours * 1e3, bare * 1e3, kRuns);
    if (!gProgram.empty()) {
        printf("  of which building and releasing the program: %.2f ms\n", median(gProgram) * 1e3);
    }
    printf("ratio noeffect_rgba ours/bare = %.2f (target <= 1.2)\n", ours / bare);
    return 0;
}
