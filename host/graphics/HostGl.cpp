#include "host/graphics/HostGl.h"

#include <stdlib.h>

#include "core/egl/EglExtensions.h"
#include "host/graphics/EglDisplayReferences.h"
#include "host/graphics/RasteriserAffinity.h"
#include "vccore/vc_log.h"

namespace android {

namespace {

const EGLint kConfigAttribs[] = {EGL_SURFACE_TYPE,
                                 EGL_PBUFFER_BIT,
                                 EGL_RENDERABLE_TYPE,
                                 EGL_OPENGL_ES2_BIT,
                                 EGL_RED_SIZE,
                                 8,
                                 EGL_GREEN_SIZE,
                                 8,
                                 EGL_BLUE_SIZE,
                                 8,
                                 EGL_ALPHA_SIZE,
                                 8,
                                 EGL_NONE};
const EGLint kContextAttribs[] = {EGL_CONTEXT_CLIENT_VERSION, 2, EGL_NONE};
const EGLint kPbufferAttribs[] = {EGL_WIDTH, 1, EGL_HEIGHT, 1, EGL_NONE};

std::atomic<void (*)()> gDisplayIdleHook{nullptr};

}  // namespace

HostGl& HostGl::get() {
    // Never destroyed: buffers may be released by static destructors.
    static HostGl* instance = new HostGl();
    return *instance;
}

void HostGl::prepareDisplay() {
    // Mesa needs a platform without a display server; a caller's own choice wins.
    setenv("EGL_PLATFORM", "surfaceless", 0);
}

HostGl::HostGl()
    : mUsers(0),
      mDisplay(EGL_NO_DISPLAY),
      mContext(EGL_NO_CONTEXT),
      mSurface(EGL_NO_SURFACE),
      mFramebuffer(0),
      mCompilerResident(false),
      mHeldDisplay(EGL_NO_DISPLAY),
      mFences(false) {}

bool HostGl::acquire() {
    std::lock_guard<std::mutex> guard(mLock);
    if (mUsers == 0 && !create_l()) return false;
    ++mUsers;
    return true;
}

void HostGl::release() {
    std::lock_guard<std::mutex> guard(mLock);
    if (mUsers == 0) return;
    if (--mUsers == 0) destroy_l();
}

bool HostGl::create_l() {
    prepareDisplay();
    mDisplay = eglGetDisplay(EGL_DEFAULT_DISPLAY);
    if (mDisplay == EGL_NO_DISPLAY || !eglInitialize(mDisplay, nullptr, nullptr)) {
        VF_LogMsg(VF_LOG_ERROR, "HostGl: no EGL display (0x%04x)", eglGetError());
        mDisplay = EGL_NO_DISPLAY;
        return false;
    }
    EGLConfig config = nullptr;
    EGLint count = 0;
    if (!eglChooseConfig(mDisplay, kConfigAttribs, &config, 1, &count) || count < 1 ||
        (mContext = eglCreateContext(mDisplay, config, EGL_NO_CONTEXT, kContextAttribs)) ==
            EGL_NO_CONTEXT ||
        (mSurface = eglCreatePbufferSurface(mDisplay, config, kPbufferAttribs)) == EGL_NO_SURFACE) {
        VF_LogMsg(VF_LOG_ERROR, "HostGl: cannot create the host context (0x%04x)", eglGetError());
        destroy_l();
        return false;
    }
    RasteriserAffinity_apply(mDisplay);
    // Without fences glFinish() orders instead.
    mFences = EglExtensions::hasEgl(mDisplay, "EGL_KHR_fence_sync") &&
              EglExtensions::get().eglCreateSyncKHR != nullptr;
    mHeldDisplay = mDisplay;
    return true;
}

void HostGl::destroy_l() {
    if (mDisplay == EGL_NO_DISPLAY) return;
    // Our own eglTerminate below must not look like another user leaving.
    mHeldDisplay = EGL_NO_DISPLAY;
    if (mFramebuffer != 0 && mContext != EGL_NO_CONTEXT) {
        visit_l([this] {
            glDeleteFramebuffers(1, &mFramebuffer);
            return true;
        });
    }
    mFramebuffer = 0;
    mCompilerResident = false;
    if (mSurface != EGL_NO_SURFACE) eglDestroySurface(mDisplay, mSurface);
    if (mContext != EGL_NO_CONTEXT) eglDestroyContext(mDisplay, mContext);
    // Drops this layer's reference; the display ends only with its last user.
    eglTerminate(mDisplay);
    mSurface = EGL_NO_SURFACE;
    mContext = EGL_NO_CONTEXT;
    mDisplay = EGL_NO_DISPLAY;
}

void HostGl::fenceCurrent(EGLDisplay display) {
    const EglExtensions& ext = EglExtensions::get();
    if (mFences && display == mDisplay) {
        EGLSyncKHR sync = ext.eglCreateSyncKHR(mDisplay, EGL_SYNC_FENCE_KHR, nullptr);
        if (sync != EGL_NO_SYNC_KHR) {
            ext.eglClientWaitSyncKHR(mDisplay, sync, EGL_SYNC_FLUSH_COMMANDS_BIT_KHR,
                                     EGL_FOREVER_KHR);
            ext.eglDestroySyncKHR(mDisplay, sync);
            return;
        }
    }
    glFinish();
}

bool HostGl::run(const std::function<bool()>& work) {
    std::lock_guard<std::mutex> guard(mLock);
    if (mUsers == 0) return false;
    return visit_l([&] {
        if (!mCompilerResident) holdCompiler_l();
        return work();
    });
}

bool HostGl::visit_l(const std::function<bool()>& work) {
    EGLDisplay display = eglGetCurrentDisplay();
    EGLContext context = eglGetCurrentContext();
    EGLSurface draw = eglGetCurrentSurface(EGL_DRAW);
    EGLSurface read = eglGetCurrentSurface(EGL_READ);

    // The caller's pending rendering (into a buffer's image, say) must be
    // done before this context reads the same storage.
    if (context != EGL_NO_CONTEXT) fenceCurrent(display);

    if (!eglMakeCurrent(mDisplay, mSurface, mSurface, mContext)) {
        VF_LogMsg(VF_LOG_ERROR, "HostGl: cannot make the host context current (0x%04x)",
                  eglGetError());
        return false;
    }
    while (glGetError() != GL_NO_ERROR) {
    }
    bool ok = work();
    // Uploads must land before the caller's context samples them.
    fenceCurrent(mDisplay);

    if (context != EGL_NO_CONTEXT) {
        if (!eglMakeCurrent(display, draw, read, context)) {
            VF_LogMsg(VF_LOG_ERROR, "HostGl: cannot restore the caller's context (0x%04x)",
                      eglGetError());
            ok = false;
        }
    } else {
        eglMakeCurrent(mDisplay, EGL_NO_SURFACE, EGL_NO_SURFACE, EGL_NO_CONTEXT);
    }
    return ok;
}

bool HostGl::waitForGpu() {
    // llvmpipe rasterizes the flushed work of all its contexts one scene
    // after another, and a fence from any context stands for the last scene
    // queued by any of them: finishing the caller's own context (which
    // flushes it first) waits for everything. Without a context of its own
    // the caller borrows this one, whose visit ends with such a fence.
    EGLDisplay display = eglGetCurrentDisplay();
    if (eglGetCurrentContext() != EGL_NO_CONTEXT && display != EGL_NO_DISPLAY &&
        display == mHeldDisplay.load()) {
        glFinish();
        return true;
    }
    return run([] { return true; });
}

void HostGl::holdCompiler_l() {
    // Mesa builds its GLSL built-in library for the first context that
    // compiles and frees it when the last one calls glReleaseShaderCompiler.
    // Pipelines that build a program per frame and release the compiler
    // after it (as the hint invites) would rebuild it every time, a few
    // milliseconds each; one compile here keeps it loaded while the host
    // context lives, as a device driver keeps its compiler.
    GLuint shader = glCreateShader(GL_FRAGMENT_SHADER);
    if (shader != 0) {
        static const char* kSource = "void main() { gl_FragColor = vec4(0.0); }";
        glShaderSource(shader, 1, &kSource, nullptr);
        glCompileShader(shader);
        glDeleteShader(shader);
    }
    while (glGetError() != GL_NO_ERROR) {
    }
    mCompilerResident = true;
}

GLuint HostGl::framebuffer_l() {
    if (mFramebuffer == 0) glGenFramebuffers(1, &mFramebuffer);
    return mFramebuffer;
}

void HostGl::setDisplayIdleHook(void (*hook)()) {
    gDisplayIdleHook = hook;
}

void HostGl::onOneDisplayReferenceLeft(EGLDisplay display) {
    // The reference left is this context's own.
    if (display == EGL_NO_DISPLAY || mHeldDisplay.load() != display) return;
    void (*hook)() = gDisplayIdleHook.load();
    if (hook != nullptr) hook();
}

bool HostGl::displayHasOtherUsers() const {
    EGLDisplay display = mHeldDisplay.load();
    return display != EGL_NO_DISPLAY && EglDisplayReferences_count(display) > 1;
}

}  // namespace android
