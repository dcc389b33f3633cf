// The EGL surface a pipeline's context is made current on: a window surface
// on an ANativeWindow (preview or recorder input) or an off-screen 1x1
// pbuffer. Create after the environment is initialised, release before it.
#ifndef CORE_EGL_EGLWINDOWSURFACE_H
#define CORE_EGL_EGLWINDOWSURFACE_H

#include <EGL/egl.h>
#include <utils/RefBase.h>
#include <utils/StrongPointer.h>

#include "core/egl/EglEnvironment.h"
#include "core/egl/EglObject.h"

struct ANativeWindow;

class EglWindowSurface : public EglObject {
public:
    enum SURFACE_TYPE {
        // On-screen preview; the window gets 3 buffers.
        SURFACE_PREVIEW = 0,
        // As SURFACE_PREVIEW, with software-readable window usage.
        SURFACE_PREVIEW_SW = 1,
        // A recorder's input window; its buffer count and usage are left alone.
        SURFACE_RECORDING = 2,
        // Off-screen 1x1 pbuffer, no window.
        SURFACE_PBUFFER = 3,
    };

    // Usage bits given to a SURFACE_PREVIEW_SW window.
    static const int kSoftwarePreviewUsage = 0x08002030;
    static const int kPreviewBufferCount = 3;

    EglWindowSurface(const android::sp<EglEnvironment>& env,
                     const android::sp<ANativeWindow>& window, SURFACE_TYPE type);
    explicit EglWindowSurface(const android::sp<EglEnvironment>& env);
    virtual ~EglWindowSurface();

    // A pbuffer ignores sizes; a window is asked to change its buffer geometry.
    void setSize(int width, int height) override;
    // A pbuffer reports 1; a window is asked each time.
    int getWidth() override;
    int getHeight() override;

    // Makes the environment's context current on this surface (draw and read).
    int bindSurface();
    // Makes no context current on the environment's display.
    int unbindSurface();
    // Posts the surface (a window's frame goes to its consumer).
    int swapSurface();

    EGLSurface getEGLSurface() const { return mEglSurface; }
    SURFACE_TYPE getSurfaceType() const { return mSurfaceType; }

protected:
    void release_l() override;
    int initialize_l() override;

private:
    SURFACE_TYPE mSurfaceType;
    EGLSurface mEglSurface;
    android::sp<ANativeWindow> mNativeWindow;
    android::sp<EglEnvironment> mEglEnv;
    bool mFlag;
};

#endif
