#include "HostGl.h"

#include <dlfcn.h>
#include <link.h>
#include <stdlib.h>
#include <string.h>

#include <map>

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
      mCreateSync(nullptr),
      mClientWaitSync(nullptr),
      mDestroySync(nullptr) {}

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
    mCreateSync = (PFNEGLCREATESYNCKHRPROC)eglGetProcAddress("eglCreateSyncKHR");
    mClientWaitSync = (PFNEGLCLIENTWAITSYNCKHRPROC)eglGetProcAddress("eglClientWaitSyncKHR");
    mDestroySync = (PFNEGLDESTROYSYNCKHRPROC)eglGetProcAddress("eglDestroySyncKHR");
    const char* extensions = eglQueryString(mDisplay, EGL_EXTENSIONS);
    if (extensions == nullptr || strstr(extensions, "EGL_KHR_fence_sync") == nullptr) {
        mCreateSync = nullptr;  // glFinish() orders instead
    }
    mHeldDisplay = mDisplay;
    return true;
}

void HostGl::destroy_l() {
    if (mDisplay == EGL_NO_DISPLAY) return;
    // Our own eglTerminate below must not look like another user leaving.
    mHeldDisplay = EGL_NO_DISPLAY;
    if (mFramebuffer != 0 && mContext != EGL_NO_CONTEXT) {
        EGLDisplay display = eglGetCurrentDisplay();
        EGLContext context = eglGetCurrentContext();
        EGLSurface draw = eglGetCurrentSurface(EGL_DRAW);
        EGLSurface read = eglGetCurrentSurface(EGL_READ);
        if (eglMakeCurrent(mDisplay, mSurface, mSurface, mContext)) {
            glDeleteFramebuffers(1, &mFramebuffer);
            if (context != EGL_NO_CONTEXT) {
                eglMakeCurrent(display, draw, read, context);
            } else {
                eglMakeCurrent(mDisplay, EGL_NO_SURFACE, EGL_NO_SURFACE, EGL_NO_CONTEXT);
            }
        }
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
    if (mCreateSync != nullptr && display == mDisplay) {
        EGLSyncKHR sync = mCreateSync(mDisplay, EGL_SYNC_FENCE_KHR, nullptr);
        if (sync != EGL_NO_SYNC_KHR) {
            mClientWaitSync(mDisplay, sync, EGL_SYNC_FLUSH_COMMANDS_BIT_KHR, EGL_FOREVER_KHR);
            mDestroySync(mDisplay, sync);
            return;
        }
    }
    glFinish();
}

bool HostGl::run(const std::function<bool()>& work) {
    std::lock_guard<std::mutex> guard(mLock);
    if (mUsers == 0) return false;

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
    if (!mCompilerResident) holdCompiler_l();
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

}  // namespace android

// Display references, as Android's EGL keeps them: every successful
// eglInitialize() counts, and eglTerminate() ends the display only with the
// last one. Mesa terminates at once, which would destroy the host context
// (and every other pipeline's context) when one pipeline releases its
// environment. These definitions take the place of libEGL's in the program
// and forward to it.
namespace {

std::mutex& referencesLock() {
    static std::mutex* lock = new std::mutex();
    return *lock;
}

std::map<EGLDisplay, int>& references() {
    static std::map<EGLDisplay, int>* map = new std::map<EGLDisplay, int>();
    return *map;
}

// Mesa loads its DRI driver at the first eglInitialize and unloads it at the
// last eglTerminate. Unloading throws away the driver's once-only state (each
// new display pays to rebuild it) and leaves its static allocations pointing
// from code that is gone, which leak checkers report as ours. Keep it resident.
int pinDriver(struct dl_phdr_info* info, size_t, void*) {
    if (info->dlpi_name != nullptr && strstr(info->dlpi_name, "_dri.so") != nullptr) {
        dlopen(info->dlpi_name, RTLD_NOW | RTLD_NOLOAD | RTLD_NODELETE);
    }
    return 0;
}

template <typename T>
T nextSymbol(const char* name) {
    return reinterpret_cast<T>(dlsym(RTLD_NEXT, name));
}

}  // namespace

namespace android {

bool HostGl::displayHasOtherUsers() const {
    EGLDisplay display = mHeldDisplay.load();
    if (display == EGL_NO_DISPLAY) return false;
    std::lock_guard<std::mutex> guard(referencesLock());
    auto found = references().find(display);
    return found != references().end() && found->second > 1;
}

}  // namespace android

extern "C" EGLBoolean eglInitialize(EGLDisplay display, EGLint* major, EGLint* minor) {
    static const auto next =
        nextSymbol<EGLBoolean (*)(EGLDisplay, EGLint*, EGLint*)>("eglInitialize");
    std::lock_guard<std::mutex> guard(referencesLock());
    EGLBoolean result = next(display, major, minor);
    if (result == EGL_TRUE && references()[display]++ == 0) dl_iterate_phdr(pinDriver, nullptr);
    return result;
}

extern "C" EGLBoolean eglTerminate(EGLDisplay display) {
    static const auto next = nextSymbol<EGLBoolean (*)(EGLDisplay)>("eglTerminate");
    int left = 0;
    {
        std::lock_guard<std::mutex> guard(referencesLock());
        auto found = references().find(display);
        if (found == references().end() || found->second <= 1) {
            if (found != references().end()) references().erase(found);
            return next(display);
        }
        left = --found->second;
    }
    // Outside the lock: letting the host context go terminates again.
    if (left == 1) android::HostGl::get().onOneDisplayReferenceLeft(display);
    return EGL_TRUE;
}
