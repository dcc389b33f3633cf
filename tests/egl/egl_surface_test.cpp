// EglWindowSurface: the 1x1 pbuffer (size rules, binding, swapping, release)
// and the window kinds on the host window.
#include <EGL/egl.h>
#include <GLES2/gl2.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>
#include <gui/HostWindow.h>
#include <system/window.h>

#include "core/egl/EglEnvironment.h"
#include "core/egl/EglWindowSurface.h"
#include "support/gl_context.h"
#include "support/log_capture.h"
#include "vccore/vc_log.h"

using android::HostWindow;
using android::sp;

namespace {

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

TEST(EglSurfaceTest, FailedDestroyIsLoggedAndTheSurfaceForgotten) {
    GlContext gl;
    ASSERT_TRUE(gl.ok());
    sp<EglEnvironment> env = gl.env();
    sp<EglWindowSurface> surface = new EglWindowSurface(env);
    ASSERT_EQ(surface->initialize(), 0);
    gl.release();  // terminates the display under the second surface

    LogCapture log;
    surface->release();
    EXPECT_TRUE(log.contains(VF_LOG_ERROR, "EGL: Call to eglDestroySurface() failed."));
    bool sawCheckLine = false;
    for (const auto& l : log.texts()) {
        sawCheckLine |=
            l.rfind("EGL Error: 0x3001 'EGL_NOT_INITIALIZED' - result = eglDestroySurface(", 0) ==
            0;
    }
    EXPECT_TRUE(sawCheckLine);
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
