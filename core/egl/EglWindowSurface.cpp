#include "core/egl/EglWindowSurface.h"

#include <android/native_window.h>
#include <system/window.h>

#include "core/egl/EglCheck.h"
#include "core/egl/EglNativeSeam.h"
#include "vccore/vc_error.h"
#include "vccore/vc_log.h"

#define VC_SOURCE "core/egl/EglWindowSurface"

using android::sp;

EglWindowSurface::EglWindowSurface(const sp<EglEnvironment>& env, const sp<ANativeWindow>& window,
                                   SURFACE_TYPE type)
    : mSurfaceType(type),
      mEglSurface(EGL_NO_SURFACE),
      mNativeWindow(window),
      mEglEnv(env),
      mFlag(false) {}

EglWindowSurface::EglWindowSurface(const sp<EglEnvironment>& env)
    : mSurfaceType(SURFACE_PBUFFER), mEglSurface(EGL_NO_SURFACE), mEglEnv(env), mFlag(false) {}

EglWindowSurface::~EglWindowSurface() {}

void EglWindowSurface::setSize(int width, int height) {
    if (mSurfaceType == SURFACE_PBUFFER || mNativeWindow == nullptr) return;
    mWidth = width;
    mHeight = height;
    ANativeWindow* window = mNativeWindow.get();
    ANativeWindow_setBuffersGeometry(window, width, height, ANativeWindow_getFormat(window));
}

int EglWindowSurface::getWidth() {
    if (mSurfaceType == SURFACE_PBUFFER || mNativeWindow == nullptr) {
        mWidth = 1;
    } else {
        mWidth = ANativeWindow_getWidth(mNativeWindow.get());
    }
    return mWidth;
}

int EglWindowSurface::getHeight() {
    if (mSurfaceType == SURFACE_PBUFFER || mNativeWindow == nullptr) {
        mHeight = 1;
    } else {
        mHeight = ANativeWindow_getHeight(mNativeWindow.get());
    }
    return mHeight;
}

// Window surfaces, and the calls that may replace one (a host follows the
// window's size with a new off-screen surface), go through the seam. The
// lambdas standing in for them carry the EGL calls' names, so that a checked
// statement logs as the EGL call it stands for.

int EglWindowSurface::initialize_l() {
    if (mEglEnv == nullptr) return VC_REPORT(VC_ERROR_INVALID_STATE);
    bool isWindow = mSurfaceType != SURFACE_PBUFFER;
    if (isWindow && mNativeWindow == nullptr) return VC_REPORT(VC_ERROR_NULL_PARAM);

    ANativeWindow* window = mNativeWindow.get();
    if (mSurfaceType == SURFACE_PREVIEW || mSurfaceType == SURFACE_PREVIEW_SW) {
        EglLog(VF_LOG_DEBUG, "Setting max buffer count to %d", kPreviewBufferCount);
        window->perform(window, NATIVE_WINDOW_SET_BUFFER_COUNT, kPreviewBufferCount);
    }

    EGLDisplay display = mEglEnv->getEGLDisplay();
    EGLConfig config = mEglEnv->getEGLConfig();
    if (!isWindow) {
        // Named locally so that the checked statement reads as it logs.
        const EGLint* sPbufferAttribs = EglEnvironment::sPbufferAttribs;
        // clang-format off
        bool created = EGL_CHECK(mEglSurface = eglCreatePbufferSurface(mEglEnv->getEGLDisplay(),
                                                                       mEglEnv->getEGLConfig(),
                                                                       sPbufferAttribs));
        // clang-format on
        if (!created) return VC_REPORT(VC_ERROR_UNKNOWN);
    } else {
        auto eglCreateWindowSurface = [](EGLDisplay dpy, EGLConfig cfg, ANativeWindow* win,
                                         const EGLint* attribs) {
            return EglNativeSeam::get().createWindowSurface(dpy, cfg, win, attribs);
        };
        if (!EGL_CHECK(mEglSurface = eglCreateWindowSurface(display, config, window, NULL))) {
            return VC_REPORT(VC_ERROR_UNKNOWN);
        }
    }
    if (mEglSurface == EGL_NO_SURFACE) return VC_REPORT(VC_ERROR_UNKNOWN);

    if (mSurfaceType == SURFACE_PREVIEW_SW) {
        window->perform(window, NATIVE_WINDOW_SET_USAGE, kSoftwarePreviewUsage);
    }
    return 0;
}

int EglWindowSurface::bindSurface() {
    if (mEglEnv == nullptr) return VC_REPORT(VC_ERROR_INVALID_STATE);
    EGLDisplay display = mEglEnv->getEGLDisplay();
    EGLContext context = mEglEnv->getEGLContext();
    // The seam makes `draw` the read surface too, and may replace it.
    auto eglMakeCurrent = [](EGLDisplay dpy, EGLSurface& draw, EGLSurface /*read*/,
                             EGLContext ctx) {
        return EglNativeSeam::get().makeCurrent(dpy, &draw, ctx);
    };
    EGLBoolean result;
    if (!EGL_CHECK_BOOL(result = eglMakeCurrent(display, mEglSurface, mEglSurface, context))) {
        return VC_REPORT(VC_ERROR_UNKNOWN);
    }
    return 0;
}

int EglWindowSurface::unbindSurface() {
    if (mEglEnv == nullptr) return VC_REPORT(VC_ERROR_INVALID_STATE);
    EGLDisplay display = mEglEnv->getEGLDisplay();
    EGLBoolean result;
    if (!EGL_CHECK_BOOL(
            result = eglMakeCurrent(display, EGL_NO_SURFACE, EGL_NO_SURFACE, EGL_NO_CONTEXT))) {
        return VC_REPORT(VC_ERROR_UNKNOWN);
    }
    return 0;
}

int EglWindowSurface::swapSurface() {
    if (mEglEnv == nullptr) return VC_REPORT(VC_ERROR_INVALID_STATE);
    EGLDisplay display = mEglEnv->getEGLDisplay();
    auto eglSwapBuffers = [](EGLDisplay dpy, EGLSurface& surface) {
        return EglNativeSeam::get().swapBuffers(dpy, &surface);
    };
    if (!EGL_CHECK_BOOL(eglSwapBuffers(display, mEglSurface))) return VC_REPORT(VC_ERROR_UNKNOWN);
    return 0;
}

void EglWindowSurface::release_l() {
    if (mEglSurface != EGL_NO_SURFACE && mEglEnv != nullptr) {
        auto eglDestroySurface = [](EGLDisplay dpy, EGLSurface surface) {
            return EglNativeSeam::get().destroySurface(dpy, surface);
        };
        EGLBoolean result;
        if (!EGL_CHECK_BOOL(result = eglDestroySurface(mEglEnv->getEGLDisplay(), mEglSurface))) {
            EglLog(VF_LOG_ERROR, "EGL: Call to eglDestroySurface() failed.");
        }
    }
    // Forgotten even when the destroy failed: the handle is no longer usable.
    mEglSurface = EGL_NO_SURFACE;
    if (mSurfaceType != SURFACE_PBUFFER && mNativeWindow != nullptr) mNativeWindow.clear();
    mEglEnv.clear();
    mFlag = false;
}
