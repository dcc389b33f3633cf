// EglEnvironment on Mesa: the attribute lists, what initialize() builds and
// the draining of stale errors; EglWindowSurface: the 1x1 pbuffer (size rules,
// binding, swapping, release), its failures, and the window kinds on the host
// window.
#include <EGL/egl.h>
#include <GLES2/gl2.h>
#include <gtest/gtest.h>
#include <dirent.h>
#include <gui/HostWindow.h>
#include <sched.h>
#include <stdlib.h>
#include <system/window.h>

#include <fstream>
#include <map>
#include <string>
#include <vector>

#include "core/egl/EglEnvironment.h"
#include "core/egl/EglExtensions.h"
#include "core/egl/EglWindowSurface.h"
#include "host/graphics/RasteriserAffinity.h"
#include "support/gl_context.h"
#include "support/log_capture.h"

using android::HostWindow;
using android::sp;

namespace {

std::vector<EGLint> list(const EGLint* attribs) {
    std::vector<EGLint> out;
    while (*attribs != EGL_NONE) out.push_back(*attribs++);
    return out;
}

TEST(EglEnvironmentTest, BuildsAnEs2ContextFromItsAttributeLists) {
    EXPECT_EQ(
        list(EglEnvironment::sDefaultConfigAttribs),
        (std::vector<EGLint>{0x3033, 1, 0x3040, 4, 0x3024, 8, 0x3023, 8, 0x3022, 8, 0x3021, 8}));
    EXPECT_EQ(list(EglEnvironment::sDefaultContextAttribs), (std::vector<EGLint>{0x3098, 2}));
    EXPECT_EQ(list(EglEnvironment::sPbufferAttribs), (std::vector<EGLint>{0x3057, 1, 0x3056, 1}));
    setenv("EGL_PLATFORM", "surfaceless", 0);
    eglMakeCurrent(nullptr, EGL_NO_SURFACE, EGL_NO_SURFACE, EGL_NO_CONTEXT);  // EGL_BAD_DISPLAY
    sp<EglEnvironment> env = new EglEnvironment();
    EXPECT_FALSE(env->isInitialized());
    EXPECT_EQ(env->getEGLDisplay(), EGL_NO_DISPLAY);
    LogCapture log;
    ASSERT_EQ(env->initialize(), 0);
    // A stale error is drained and logged once.
    EXPECT_TRUE(log.matches(
        {"E EGL Clearing error: 0x3008 'EGL_BAD_DISPLAY' at core/egl/EglEnvironment:#"}));
    EGLDisplay display = env->getEGLDisplay();
    EGLint version = 0, alpha = 0;
    EXPECT_TRUE(
        eglQueryContext(display, env->getEGLContext(), EGL_CONTEXT_CLIENT_VERSION, &version));
    EXPECT_TRUE(eglGetConfigAttrib(display, env->getEGLConfig(), EGL_ALPHA_SIZE, &alpha));
    EXPECT_EQ(std::make_pair(2, 8), std::make_pair(version, alpha));
    EXPECT_EQ(env->release(), 0);
    // The display is terminated: its context is gone.
    EXPECT_FALSE(
        eglQueryContext(display, env->getEGLContext(), EGL_CONTEXT_CLIENT_VERSION, &version));
    EXPECT_EQ(eglGetError(), EGL_NOT_INITIALIZED);

    // A GL error left pending in the current context is drained too; the host
    // display counts its users: both must end for it to terminate.
    GlContext gl;
    ASSERT_TRUE(gl.ok());
    glBindTexture(0x1234, 0);  // GL_INVALID_ENUM
    log.clear();
    sp<EglEnvironment> other = new EglEnvironment();
    ASSERT_EQ(other->initialize(), 0);
    EXPECT_TRUE(log.matches(
        {"E GL Clearing error: 0x0500 'GL_INVALID_ENUM' at core/egl/EglEnvironment:#"}));
    EXPECT_EQ(glGetError(), static_cast<GLenum>(GL_NO_ERROR));
    EXPECT_EQ(other->release(), 0);
}

std::vector<int> cpusOf(pid_t tid) {
    cpu_set_t set;
    std::vector<int> cpus;
    if (sched_getaffinity(tid, sizeof(set), &set) != 0) return cpus;
    for (int cpu = 0; cpu < CPU_SETSIZE; ++cpu) {
        if (CPU_ISSET(cpu, &set)) cpus.push_back(cpu);
    }
    return cpus;
}

// The rasteriser threads of this process: thread id by rasteriser number.
std::map<int, pid_t> rasterisers() {
    std::map<int, pid_t> found;
    DIR* dir = opendir("/proc/self/task");
    while (dirent* e = dir != nullptr ? readdir(dir) : nullptr) {
        std::string name;
        std::getline(std::ifstream(std::string("/proc/self/task/") + e->d_name + "/comm"), name);
        if (name.rfind("llvmpipe-", 0) == 0) found[atoi(name.c_str() + 9)] = atoi(e->d_name);
    }
    if (dir != nullptr) closedir(dir);
    return found;
}

// The host's software GPU: from the first context on, rasteriser thread N
// runs on the Nth core only; turned off, the threads keep every core.
TEST(EglEnvironmentTest, HostRasteriserThreadsEachKeepACoreOfTheirOwn) {
    const std::vector<int> cores = cpusOf(0);
    if (cores.size() < 2) GTEST_SKIP() << "one core";
    sp<EglEnvironment> env = new EglEnvironment();
    ASSERT_EQ(env->initialize(), 0);
    // Every thread is placed before the context is handed out, however late
    // it named itself.
    const std::map<int, pid_t> threads = rasterisers();
    EXPECT_GE(threads.size(), 2u);
    for (const auto& t : threads) {
        EXPECT_EQ(cpusOf(t.second), std::vector<int>{cores[t.first % cores.size()]}) << t.first;
    }
    cpu_set_t all;
    CPU_ZERO(&all);
    for (int cpu : cores) CPU_SET(cpu, &all);
    for (const auto& t : threads) EXPECT_EQ(sched_setaffinity(t.second, sizeof(all), &all), 0);
    setenv("KIV_HOST_RASTERISER_AFFINITY", "0", 1);
    EXPECT_EQ(android::RasteriserAffinity_apply(env->getEGLDisplay()), 0);
    for (const auto& t : threads) EXPECT_EQ(cpusOf(t.second), cores) << t.first;
    unsetenv("KIV_HOST_RASTERISER_AFFINITY");
    EXPECT_EQ(android::RasteriserAffinity_apply(env->getEGLDisplay()), (int)threads.size());
    // Another display's driver (none here) has no rasterisers to place.
    EXPECT_EQ(android::RasteriserAffinity_apply(EGL_NO_DISPLAY), 0);
    for (const auto& t : threads) {
        EXPECT_EQ(cpusOf(t.second), std::vector<int>{cores[t.first % cores.size()]}) << t.first;
    }
    EXPECT_EQ(env->release(), 0);
}

TEST_F(GlContextTest, PbufferIsOneByOneBindsSwapsAndReleases) {
    const sp<EglWindowSurface>& surface = mGl->surface();
    EGLDisplay display = mGl->env()->getEGLDisplay();
    EXPECT_EQ(surface->getSurfaceType(), EglWindowSurface::SURFACE_PBUFFER);
    surface->setSize(640, 480);  // ignored
    EGLint w = 0, h = 0;
    EXPECT_TRUE(eglQuerySurface(display, surface->getEGLSurface(), EGL_WIDTH, &w));
    EXPECT_TRUE(eglQuerySurface(display, surface->getEGLSurface(), EGL_HEIGHT, &h));
    EXPECT_EQ(std::vector<int>({1, 1, 1, 1}),
              std::vector<int>({surface->getWidth(), surface->getHeight(), w, h}));
    EXPECT_EQ(eglGetCurrentSurface(EGL_DRAW), surface->getEGLSurface());
    EXPECT_EQ(eglGetCurrentSurface(EGL_READ), surface->getEGLSurface());
    EXPECT_EQ(surface->swapSurface(), 0);
    EXPECT_EQ(surface->unbindSurface(), 0);
    EXPECT_EQ(eglGetCurrentContext(), EGL_NO_CONTEXT);
    EXPECT_EQ(surface->bindSurface(), 0);
    EXPECT_EQ(eglGetCurrentContext(), mGl->env()->getEGLContext());
    // A second pbuffer on the same environment, released without a word.
    sp<EglWindowSurface> second = new EglWindowSurface(mGl->env());
    ASSERT_EQ(second->initialize(), 0);
    EGLSurface egl = second->getEGLSurface();
    ASSERT_EQ(second->bindSurface(), 0);
    EXPECT_EQ(eglGetCurrentSurface(EGL_DRAW), egl);
    ASSERT_EQ(surface->bindSurface(), 0);
    LogCapture log;
    second->release();
    EXPECT_TRUE(log.lines().empty());
    EXPECT_EQ(second->getEGLSurface(), EGL_NO_SURFACE);
    EXPECT_FALSE(eglQuerySurface(display, egl, EGL_WIDTH, &w));
    EXPECT_NE(second->bindSurface(), 0);  // the environment reference is gone
    // Extension names are whole words of the driver's lists; entry points are
    // looked up once, for the library and the host layer alike.
    EXPECT_TRUE(EglExtensions::hasEgl(display, "EGL_KHR_fence_sync"));
    EXPECT_TRUE(EglExtensions::hasGl("GL_OES_EGL_image_external"));
    for (const char* part : {"EGL_KHR_fence", "KHR_fence_sync", "EGL_KHR_fence_syn"})
        EXPECT_FALSE(EglExtensions::hasEgl(display, part)) << part;
    EXPECT_FALSE(EglExtensions::hasGl("GL_OES_EGL_image_ext"));
    EXPECT_EQ(&EglExtensions::get(), &EglExtensions::get());
    EXPECT_TRUE(EglExtensions::get().eglCreateImageKHR &&
                EglExtensions::get().eglClientWaitSyncKHR &&
                EglExtensions::get().glEGLImageTargetTexture2DOES);
}

// On a terminated display each failing call logs its statement as written,
// then the status line; a failed surface lets its window go.
TEST(EglSurfaceTest, FailuresAreLoggedAndTheSurfaceForgotten) {
    GlContext gl;
    ASSERT_TRUE(gl.ok());
    sp<EglEnvironment> env = gl.env();
    sp<EglWindowSurface> surface = new EglWindowSurface(env);
    ASSERT_EQ(surface->initialize(), 0);
    gl.release();  // terminates the display under the second surface
    sp<HostWindow> window = new HostWindow(8, 4);
    sp<EglWindowSurface> onWindow =
        new EglWindowSurface(env, window, EglWindowSurface::SURFACE_RECORDING);
    sp<EglWindowSurface> late = new EglWindowSurface(env);
    LogCapture log;
    EXPECT_EQ(surface->bindSurface(), -1);
    EXPECT_EQ(surface->swapSurface(), -1);
    EXPECT_EQ(onWindow->initialize(), -1);
    EXPECT_EQ(window->getConnectedApi(), 0);
    // The code depends on the call (a gone display or an uninitialised one).
    const char* statements[] = {
        "' - result = eglMakeCurrent(display, mEglSurface, mEglSurface, context) at ",
        "' - eglSwapBuffers(display, mEglSurface) at ",
        "' - mEglSurface = eglCreateWindowSurface(display, config, window, NULL) at "};
    const std::vector<std::string> texts = log.texts();
    ASSERT_EQ(6u, texts.size());
    for (int i = 0; i < 3; ++i) {
        EXPECT_EQ(0u, texts[2 * i].rfind("EGL Error: 0x300", 0)) << texts[2 * i];
        EXPECT_NE(std::string::npos, texts[2 * i].find(statements[i])) << texts[2 * i];
        EXPECT_EQ(0u,
                  texts[2 * i + 1].rfind("VC_ERROR_UNKNOWN (-1): core/egl/EglWindowSurface:", 0));
    }
    onWindow->release();
    log.clear();
    surface->release();
    EXPECT_EQ(surface->getEGLSurface(), EGL_NO_SURFACE);
    EXPECT_EQ(late->initialize(), -1);
    late->release();
    EXPECT_TRUE(log.matches(std::vector<std::string>{
        "E EGL Error: 0x3001 'EGL_NOT_INITIALIZED' - result = eglDestroySurface("
        "mEglEnv->getEGLDisplay(), mEglSurface) at core/egl/EglWindowSurface:#",
        "E EGL: Call to eglDestroySurface() failed.",
        "E EGL Error: 0x3001 'EGL_NOT_INITIALIZED' - mEglSurface = eglCreatePbufferSurface("
        "mEglEnv->getEGLDisplay(), mEglEnv->getEGLConfig(), sPbufferAttribs) at "
        "core/egl/EglWindowSurface:#",
        "E VC_ERROR_UNKNOWN (-1): core/egl/EglWindowSurface:#"}));
}

// The preview gets three buffers and leaves the usage alone; recording asks
// the window (not a cached size); the software preview sets its usage.
TEST_F(GlContextTest, WindowKindsOnTheHostWindow) {
    sp<HostWindow> preview = new HostWindow(8, 4), recorder = new HostWindow(8, 4),
                   software = new HostWindow(8, 4);
    ASSERT_EQ(native_window_set_buffer_count(preview.get(), 5), 0);
    ASSERT_EQ(native_window_set_buffer_count(recorder.get(), 5), 0);
    const uint64_t usage = preview->getConsumerUsage();
    ASSERT_NE(usage, 0x08002030u);
    sp<EglWindowSurface> p =
        new EglWindowSurface(mGl->env(), preview, EglWindowSurface::SURFACE_PREVIEW);
    sp<EglWindowSurface> r =
        new EglWindowSurface(mGl->env(), recorder, EglWindowSurface::SURFACE_RECORDING);
    sp<EglWindowSurface> s =
        new EglWindowSurface(mGl->env(), software, EglWindowSurface::SURFACE_PREVIEW_SW);
    ASSERT_EQ(p->initialize(), 0);
    ASSERT_EQ(r->initialize(), 0);
    ASSERT_EQ(s->initialize(), 0);
    EXPECT_EQ(std::vector<int>({3, 5, 3}),
              std::vector<int>({preview->getBufferCount(), recorder->getBufferCount(),
                                software->getBufferCount()}));
    EXPECT_EQ(std::vector<uint64_t>({usage, usage, 0x08002030u}),
              std::vector<uint64_t>({preview->getConsumerUsage(), recorder->getConsumerUsage(),
                                     software->getConsumerUsage()}));
    EXPECT_EQ(std::make_pair(8, 4), std::make_pair(p->getWidth(), p->getHeight()));
    r->setSize(32, 16);
    EXPECT_EQ(std::make_pair(32, 16), std::make_pair(r->getWidth(), r->getHeight()));
    ASSERT_EQ(native_window_set_buffers_dimensions(recorder.get(), 10, 6), 0);
    EXPECT_EQ(std::make_pair(10, 6), std::make_pair(r->getWidth(), r->getHeight()));
    // A swap queues one frame (its pixels are the host window suite's business).
    ASSERT_EQ(p->bindSurface(), 0);
    ASSERT_EQ(p->swapSurface(), 0);
    EXPECT_EQ(preview->queuedFrameCount(), 1u);
    ASSERT_EQ(mGl->surface()->bindSurface(), 0);
    for (auto& surface : {p, r, s}) surface->release();
    EXPECT_EQ(p->getEGLSurface(), EGL_NO_SURFACE);
    EXPECT_EQ(preview->getConnectedApi(), 0);
    EXPECT_EQ(preview->getStrongCount(), 1);  // the surface gave its reference back
}

}  // namespace
