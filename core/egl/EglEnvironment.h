// The EGL display, configuration and OpenGL ES 2 context of one pipeline.
// Not an EglObject: it has no size and no lock; its owner drives it from the
// GL thread (initialize, then surfaces, then release after the surfaces).
#ifndef CORE_EGL_EGLENVIRONMENT_H
#define CORE_EGL_EGLENVIRONMENT_H

#include <EGL/egl.h>
#include <utils/RefBase.h>

class EglEnvironment : public virtual android::RefBase {
public:
    // Pbuffer-capable RGBA8888 configuration, no depth or stencil. Window
    // surfaces are made with the same configuration.
    static const EGLint sDefaultConfigAttribs[];
    static const EGLint sDefaultContextAttribs[];
    // The 1x1 off-screen surface of a pipeline that draws into framebuffers only.
    static const EGLint sPbufferAttribs[];

    EglEnvironment();
    virtual ~EglEnvironment();

    // 0, or -1 on the first failing EGL step (what was made so far stays set
    // for release()).
    int initialize();
    // Destroys the context and terminates the display; the caller unbinds first.
    int release();

    EGLDisplay getEGLDisplay() const { return mEglDisplay; }
    EGLContext getEGLContext() const { return mEglContext; }
    EGLConfig getEGLConfig() const { return mEglConfig; }
    bool isInitialized() const { return mInitialized != 0; }

    EglEnvironment(const EglEnvironment&) = delete;
    EglEnvironment& operator=(const EglEnvironment&) = delete;

private:
    EGLDisplay mEglDisplay;
    EGLContext mEglContext;
    EGLConfig mEglConfig;
    int mInitialized;
};

#endif
