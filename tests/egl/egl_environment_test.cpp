// EglEnvironment on Mesa: the attribute lists, what initialize() builds and
// the draining of stale errors (repeated set-up/tear-down runs in every GL
// suite: each case makes and ends its own environment); EglWindowSurface: the
// 1x1 pbuffer (size rules, binding, swapping, release) and the window kinds on
// the host window.
#include <EGL/egl.h>
#include <GLES2/gl2.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <gui/HostWindow.h>
#include <system/window.h>

#include <string>
#include <vector>

#include "core/egl/EglEnvironment.h"
#include "core/egl/EglExtensions.h"
#include "core/egl/EglWindowSurface.h"
#include "support/gl_context.h"
#include "support/log_capture.h"
#include "vccore/vc_log.h"

using android::HostWindow;
using android::sp;

namespace {

std::vector<EGLint> list(const EGLint* attribs) {
    std::vector<EGLint> out;
    while (*attribs != EGL_NONE) out.push_back(*attribs++);
    out.push_back(EGL_NONE);
    return out;
}

TEST(EglEnvironmentTest, AttributeListsAreExact) {
    EXPECT_EQ(list(EglEnvironment::sDefaultConfigAttribs),
              (std::vector<EGLint>{0x3033, 0x0001, 0x3040, 0x0004, 0x3024, 8, 0x3023, 8, 0x3022, 8,
                                   0x3021, 8, 0x3038}));
    EXPECT_EQ(list(EglEnvironment::sDefaultContextAttribs),
              (std::vector<EGLint>{0x3098, 2, 0x3038}));
    EXPECT_EQ(list(EglEnvironment::sPbufferAttribs),
              (std::vector<EGLint>{0x3057, 1, 0x3056, 1, 0x3038}));
}

TEST(EglEnvironmentTest, InitializeBuildsAnEs2ContextOnTheDefaultConfig) {
    setenv("EGL_PLATFORM", "surfaceless", 0);
    sp<EglEnvironment> env = new EglEnvironment();
    EXPECT_FALSE(env->isInitialized());
    EXPECT_EQ(env->getEGLDisplay(), EGL_NO_DISPLAY);
    LogCapture log;
    ASSERT_EQ(env->initialize(), 0);
    EXPECT_TRUE(log.lines().empty());
    EXPECT_TRUE(env->isInitialized());
    EGLDisplay display = env->getEGLDisplay();
    EGLConfig config = env->getEGLConfig();
    ASSERT_NE(display, EGL_NO_DISPLAY);
    ASSERT_NE(config, nullptr);

    EGLint value = 0;
    EXPECT_TRUE(eglQueryContext(display, env->getEGLContext(), EGL_CONTEXT_CLIENT_VERSION, &value));
    EXPECT_EQ(value, 2);
    // The config has the alpha channel our attribute list asks for.
    EXPECT_TRUE(eglGetConfigAttrib(display, config, EGL_ALPHA_SIZE, &value));
    EXPECT_EQ(value, 8);

    EXPECT_EQ(env->release(), 0);
    // The display is terminated: its context is gone.
    EXPECT_FALSE(
        eglQueryContext(display, env->getEGLContext(), EGL_CONTEXT_CLIENT_VERSION, &value));
    EXPECT_EQ(eglGetError(), EGL_NOT_INITIALIZED);
}

TEST(EglEnvironmentTest, PendingEglAndGlErrorsAreClearedAndLoggedOnce) {
    setenv("EGL_PLATFORM", "surfaceless", 0);
    eglMakeCurrent(nullptr, EGL_NO_SURFACE, EGL_NO_SURFACE, EGL_NO_CONTEXT);  // EGL_BAD_DISPLAY
    LogCapture log;
    sp<EglEnvironment> env = new EglEnvironment();
    ASSERT_EQ(env->initialize(), 0);
    ASSERT_EQ(log.lines().size(), 1u);
    EXPECT_EQ(log.lines()[0].level, VF_LOG_ERROR);
    EXPECT_EQ(log.lines()[0].text.rfind(
                  "EGL Clearing error: 0x3008 'EGL_BAD_DISPLAY' at core/egl/EglEnvironment:", 0),
              0u)
        << log.lines()[0].text;
    env->release();

    // A GL error left pending in the current context is drained too.
    GlContext gl;
    ASSERT_TRUE(gl.ok());
    glBindTexture(0x1234, 0);  // GL_INVALID_ENUM
    log.clear();
    sp<EglEnvironment> other = new EglEnvironment();
    ASSERT_EQ(other->initialize(), 0);
    ASSERT_EQ(log.lines().size(), 1u);
    EXPECT_EQ(log.lines()[0].text.rfind(
                  "GL Clearing error: 0x0500 'GL_INVALID_ENUM' at core/egl/EglEnvironment:", 0),
              0u)
        << log.lines()[0].text;
    EXPECT_EQ(glGetError(), static_cast<GLenum>(GL_NO_ERROR));
    // The host display counts its users: both must end for it to terminate.
    EXPECT_EQ(other->release(), 0);
    gl.release();
}

TEST_F(GlContextTest, PbufferIsOneByOneBindsSwapsAndReleases) {
    const sp<EglWindowSurface>& surface = mGl->surface();
    EGLDisplay display = mGl->env()->getEGLDisplay();
    EXPECT_EQ(surface->getSurfaceType(), EglWindowSurface::SURFACE_PBUFFER);
    surface->setSize(640, 480);  // ignored
    EXPECT_EQ(surface->getWidth(), 1);
    EXPECT_EQ(surface->getHeight(), 1);
    EGLint w = 0, h = 0;
    EXPECT_TRUE(eglQuerySurface(display, surface->getEGLSurface(), EGL_WIDTH, &w));
    EXPECT_TRUE(eglQuerySurface(display, surface->getEGLSurface(), EGL_HEIGHT, &h));
    EXPECT_EQ(std::make_pair(w, h), std::make_pair(1, 1));
    EXPECT_EQ(eglGetCurrentSurface(EGL_DRAW), surface->getEGLSurface());
    EXPECT_EQ(eglGetCurrentSurface(EGL_READ), surface->getEGLSurface());
    EXPECT_EQ(surface->swapSurface(), 0);
    EXPECT_EQ(surface->unbindSurface(), 0);
    EXPECT_EQ(eglGetCurrentContext(), EGL_NO_CONTEXT);
    EXPECT_EQ(eglGetCurrentSurface(EGL_DRAW), EGL_NO_SURFACE);
    EXPECT_EQ(surface->bindSurface(), 0);
    EXPECT_EQ(eglGetCurrentContext(), mGl->env()->getEGLContext());

    // A second pbuffer on the same environment.
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
    EXPECT_EQ(eglGetError(), EGL_BAD_SURFACE);
    EXPECT_NE(second->bindSurface(), 0);  // the environment reference is gone
}

// Extension names are whole words of the driver's lists; entry points are
// looked up once, for the library and the host layer alike.
TEST_F(GlContextTest, ExtensionsAreFoundByWholeName) {
    EGLDisplay display = mGl->env()->getEGLDisplay();
    EXPECT_TRUE(EglExtensions::hasEgl(display, "EGL_KHR_fence_sync"));
    EXPECT_TRUE(EglExtensions::hasGl("GL_OES_EGL_image_external"));
    for (const char* part : {"EGL_KHR_fence", "KHR_fence_sync", "EGL_KHR_fence_syn"}) {
        EXPECT_FALSE(EglExtensions::hasEgl(display, part)) << part;
    }
    EXPECT_FALSE(EglExtensions::hasGl("GL_OES_EGL_image_ext"));
    const EglExtensions& ext = EglExtensions::get();
    EXPECT_EQ(&ext, &EglExtensions::get());
    EXPECT_NE(ext.eglCreateImageKHR, nullptr);
    EXPECT_NE(ext.glEGLImageTargetTexture2DOES, nullptr);
    EXPECT_NE(ext.eglClientWaitSyncKHR, nullptr);
}

TEST(EglSurfaceTest, FailedDestroyIsLoggedAndTheSurfaceForgotten) {
    GlContext gl;
    ASSERT_TRUE(gl.ok());
    sp<EglEnvironment> env = gl.env();
    sp<EglWindowSurface> surface = new EglWindowSurface(env);
    ASSERT_EQ(surface->initialize(), 0);
    gl.release();  // terminates the display under the second surface

    // Each failing call logs its statement as written, then the status line.
    LogCapture log;
    EXPECT_EQ(surface->bindSurface(), -1);
    EXPECT_EQ(surface->swapSurface(), -1);
    sp<HostWindow> window = new HostWindow(8, 4);
    sp<EglWindowSurface> onWindow =
        new EglWindowSurface(env, window, EglWindowSurface::SURFACE_RECORDING);
    EXPECT_EQ(onWindow->initialize(), -1);
    const char* statements[] = {
        "result = eglMakeCurrent(display, mEglSurface, mEglSurface, context)",
        "eglSwapBuffers(display, mEglSurface)",
        "mEglSurface = eglCreateWindowSurface(display, config, window, NULL)"};
    std::vector<std::string> failed = log.texts();
    ASSERT_EQ(failed.size(), 6u);
    for (size_t i = 0; i < 3; ++i) {
        // The code depends on the call (a gone display or an uninitialised one).
        const std::string& line = failed[2 * i];
        EXPECT_EQ(line.rfind("EGL Error: 0x300", 0), 0u) << line;
        EXPECT_NE(line.find(std::string("' - ") + statements[i] + " at core/egl/EglWindowSurface:"),
                  std::string::npos)
            << line;
        EXPECT_EQ(failed[2 * i + 1].rfind("VC_ERROR_UNKNOWN (-1): core/egl/EglWindowSurface:", 0),
                  0u);
    }
    EXPECT_EQ(window->getConnectedApi(), 0);  // the failed surface let the window go
    onWindow->release();

    log.clear();
    surface->release();
    EXPECT_TRUE(log.contains(VF_LOG_ERROR, "EGL: Call to eglDestroySurface() failed."));
    EXPECT_EQ(
        log.countPrefix("EGL Error: 0x3001 'EGL_NOT_INITIALIZED' - result = eglDestroySurface("),
        1u);
    EXPECT_EQ(surface->getEGLSurface(), EGL_NO_SURFACE);

    // A surface on the terminated display cannot be made.
    log.clear();
    sp<EglWindowSurface> late = new EglWindowSurface(env);
    EXPECT_EQ(late->initialize(), -1);
    std::vector<std::string> lines = log.texts();
    ASSERT_EQ(lines.size(), 2u);
    EXPECT_EQ(lines[0].rfind("EGL Error: 0x3001 'EGL_NOT_INITIALIZED' - mEglSurface = "
                             "eglCreatePbufferSurface(mEglEnv->getEGLDisplay(), "
                             "mEglEnv->getEGLConfig(), sPbufferAttribs) at "
                             "core/egl/EglWindowSurface:",
                             0),
              0u)
        << lines[0];
    EXPECT_EQ(lines[1].rfind("VC_ERROR_UNKNOWN (-1): core/egl/EglWindowSurface:", 0), 0u);
    late->release();
}

TEST_F(GlContextTest, PreviewWindowGetsThreeBuffersAndReceivesSwappedFrames) {
    sp<HostWindow> window = new HostWindow(8, 4);
    ASSERT_EQ(native_window_set_buffer_count(window.get(), 5), 0);
    const uint64_t usage = window->getConsumerUsage();
    sp<EglWindowSurface> surface =
        new EglWindowSurface(mGl->env(), window, EglWindowSurface::SURFACE_PREVIEW);
    LogCapture log;
    ASSERT_EQ(surface->initialize(), 0);
    EXPECT_TRUE(log.contains(VF_LOG_DEBUG, "Setting max buffer count to 3"));
    EXPECT_EQ(window->getBufferCount(), 3);
    EXPECT_EQ(window->getConsumerUsage(), usage);  // only the software preview sets usage
    EXPECT_EQ(surface->getWidth(), 8);
    EXPECT_EQ(surface->getHeight(), 4);

    // A swap queues one frame (its pixels are the host window suite's business).
    ASSERT_EQ(surface->bindSurface(), 0);
    ASSERT_EQ(surface->swapSurface(), 0);
    EXPECT_EQ(window->queuedFrameCount(), 1u);

    ASSERT_EQ(mGl->surface()->bindSurface(), 0);
    surface->release();
    EXPECT_EQ(surface->getEGLSurface(), EGL_NO_SURFACE);
    EXPECT_EQ(window->getConnectedApi(), 0);
    EXPECT_EQ(window->getStrongCount(), 1);  // the surface gave its reference back
}

TEST_F(GlContextTest, RecordingAsksTheWindowAndSoftwarePreviewSetsItsUsage) {
    sp<HostWindow> recorder = new HostWindow(8, 4);
    ASSERT_EQ(native_window_set_buffer_count(recorder.get(), 5), 0);
    const uint64_t usage = recorder->getConsumerUsage();
    sp<EglWindowSurface> recording =
        new EglWindowSurface(mGl->env(), recorder, EglWindowSurface::SURFACE_RECORDING);
    LogCapture log;
    ASSERT_EQ(recording->initialize(), 0);
    EXPECT_FALSE(log.contains("Setting max buffer count to 3"));
    EXPECT_EQ(recorder->getBufferCount(), 5);
    EXPECT_EQ(recorder->getConsumerUsage(), usage);
    recording->setSize(32, 16);
    EXPECT_EQ(recording->getWidth(), 32);
    EXPECT_EQ(recording->getHeight(), 16);
    // The window changed behind the surface's back: asked again, not cached.
    ASSERT_EQ(native_window_set_buffers_dimensions(recorder.get(), 10, 6), 0);
    EXPECT_EQ(recording->getWidth(), 10);
    EXPECT_EQ(recording->getHeight(), 6);
    recording->release();

    sp<HostWindow> preview = new HostWindow(8, 4);
    ASSERT_NE(preview->getConsumerUsage(), 0x08002030u);
    sp<EglWindowSurface> sw =
        new EglWindowSurface(mGl->env(), preview, EglWindowSurface::SURFACE_PREVIEW_SW);
    ASSERT_EQ(sw->initialize(), 0);
    EXPECT_EQ(preview->getConsumerUsage(), 0x08002030u);
    EXPECT_EQ(preview->getBufferCount(), 3);
    sw->release();
}

}  // namespace
