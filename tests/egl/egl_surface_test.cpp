// EglWindowSurface as a 1x1 pbuffer: size rules, binding, swapping, release.
#include <EGL/egl.h>
#include <gtest/gtest.h>

#include "core/egl/EglEnvironment.h"
#include "core/egl/EglWindowSurface.h"
#include "support/gl_context.h"
#include "support/log_capture.h"
#include "vccore/vc_log.h"

using android::sp;

namespace {

TEST_F(GlContextTest, PbufferIsOneByOneWhateverTheRequestedSize) {
    const sp<EglWindowSurface>& surface = mGl->surface();
    EXPECT_EQ(surface->getSurfaceType(), EglWindowSurface::SURFACE_PBUFFER);
    surface->setSize(640, 480);
    EXPECT_EQ(surface->getWidth(), 1);
    EXPECT_EQ(surface->getHeight(), 1);
    EGLint w = 0, h = 0;
    EGLDisplay display = mGl->env()->getEGLDisplay();
    EXPECT_TRUE(eglQuerySurface(display, surface->getEGLSurface(), EGL_WIDTH, &w));
    EXPECT_TRUE(eglQuerySurface(display, surface->getEGLSurface(), EGL_HEIGHT, &h));
    EXPECT_EQ(w, 1);
    EXPECT_EQ(h, 1);
}

TEST_F(GlContextTest, BindUnbindAndSwap) {
    const sp<EglWindowSurface>& surface = mGl->surface();
    EGLSurface egl = surface->getEGLSurface();
    EXPECT_EQ(eglGetCurrentContext(), mGl->env()->getEGLContext());
    EXPECT_EQ(eglGetCurrentSurface(EGL_DRAW), egl);
    EXPECT_EQ(eglGetCurrentSurface(EGL_READ), egl);
    EXPECT_EQ(surface->swapSurface(), 0);

    EXPECT_EQ(surface->unbindSurface(), 0);
    EXPECT_EQ(eglGetCurrentContext(), EGL_NO_CONTEXT);
    EXPECT_EQ(eglGetCurrentSurface(EGL_DRAW), EGL_NO_SURFACE);
    EXPECT_EQ(surface->bindSurface(), 0);
    EXPECT_EQ(eglGetCurrentContext(), mGl->env()->getEGLContext());
}

TEST_F(GlContextTest, SecondPbufferSharesTheContextAndReleasesCleanly) {
    sp<EglWindowSurface> second = new EglWindowSurface(mGl->env());
    ASSERT_EQ(second->initialize(), 0);
    EGLSurface egl = second->getEGLSurface();
    ASSERT_NE(egl, EGL_NO_SURFACE);
    ASSERT_EQ(second->bindSurface(), 0);
    EXPECT_EQ(eglGetCurrentSurface(EGL_DRAW), egl);
    ASSERT_EQ(mGl->surface()->bindSurface(), 0);

    LogCapture log;
    second->release();
    EXPECT_TRUE(log.lines().empty());
    EXPECT_EQ(second->getEGLSurface(), EGL_NO_SURFACE);
    EGLint w = 0;
    EXPECT_FALSE(eglQuerySurface(mGl->env()->getEGLDisplay(), egl, EGL_WIDTH, &w));
    EXPECT_EQ(eglGetError(), EGL_BAD_SURFACE);
    // Released for good: the environment reference is gone.
    EXPECT_NE(second->bindSurface(), 0);
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
        if (l.rfind("EGL Error: 0x3001 'EGL_NOT_INITIALIZED' - result = eglDestroySurface(", 0) ==
            0)
            sawCheckLine = true;
    }
    EXPECT_TRUE(sawCheckLine);
    EXPECT_EQ(surface->getEGLSurface(), EGL_NO_SURFACE);
}

}  // namespace
