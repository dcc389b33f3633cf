#include "core/egl/EglEnvironment.h"

#include "core/egl/EglCheck.h"
#include "core/egl/EglNativeSeam.h"
#include "vccore/vc_error.h"

#define VC_SOURCE "core/egl/EglEnvironment"

// clang-format off
const EGLint EglEnvironment::sDefaultConfigAttribs[] = {
    EGL_SURFACE_TYPE, EGL_PBUFFER_BIT,
    EGL_RENDERABLE_TYPE, EGL_OPENGL_ES2_BIT,
    EGL_RED_SIZE, 8,
    EGL_GREEN_SIZE, 8,
    EGL_BLUE_SIZE, 8,
    EGL_ALPHA_SIZE, 8,
    EGL_NONE};
// clang-format on

const EGLint EglEnvironment::sDefaultContextAttribs[] = {EGL_CONTEXT_CLIENT_VERSION, 2, EGL_NONE};

const EGLint EglEnvironment::sPbufferAttribs[] = {EGL_WIDTH, 1, EGL_HEIGHT, 1, EGL_NONE};

EglEnvironment::EglEnvironment()
    : mEglDisplay(EGL_NO_DISPLAY),
      mEglContext(EGL_NO_CONTEXT),
      mEglConfig(nullptr),
      mInitialized(0) {}

EglEnvironment::~EglEnvironment() {}

int EglEnvironment::initialize() {
    EGL_GL_CLEAR_ERRORS();

    // A headless host has to choose its EGL platform before the first display.
    EglNativeSeam::get().prepareDisplay();

    if (!EGL_CHECK(mEglDisplay = eglGetDisplay(EGL_DEFAULT_DISPLAY)) ||
        mEglDisplay == EGL_NO_DISPLAY) {
        return VC_REPORT(VC_ERROR_UNKNOWN);
    }

    EGLint majorVersion = 0;
    EGLint minorVersion = 0;
    EGLBoolean result;
    if (!EGL_CHECK_BOOL(result = eglInitialize(mEglDisplay, &majorVersion, &minorVersion))) {
        return VC_REPORT(VC_ERROR_UNKNOWN);
    }

    // The first matching configuration is taken as it is; zero matches show
    // up as a failed context creation below.
    EGLint numConfigs = 0;
    if (!EGL_CHECK_BOOL(result = eglChooseConfig(mEglDisplay, sDefaultConfigAttribs, &mEglConfig, 1,
                                                 &numConfigs))) {
        return VC_REPORT(VC_ERROR_UNKNOWN);
    }

    if (!EGL_CHECK(mEglContext = eglCreateContext(mEglDisplay, mEglConfig, EGL_NO_CONTEXT,
                                                  sDefaultContextAttribs)) ||
        mEglContext == EGL_NO_CONTEXT) {
        return VC_REPORT(VC_ERROR_UNKNOWN);
    }
    EglNativeSeam::get().contextCreated(mEglDisplay);

    mInitialized = 1;
    return 0;
}

int EglEnvironment::release() {
    EGL_GL_CLEAR_ERRORS();
    EGLBoolean result;
    EGL_CHECK_BOOL(result = eglDestroyContext(mEglDisplay, mEglContext));
    EGL_CHECK_BOOL(result = eglTerminate(mEglDisplay));
    return 0;
}
