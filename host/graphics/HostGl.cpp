#include "HostGl.h"

#include <dlfcn.h>
#include <link.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#include <map>

#include "SharedPixels.h"
#include "core/egl/EglExtensions.h"
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

// Whether textures can take shared memory as storage: unknown until the
// first import tries, then settled for the process (one driver per process).
enum ImportState { IMPORT_UNKNOWN, IMPORT_WORKS, IMPORT_FAILS };
std::atomic<int> gImportState{IMPORT_UNKNOWN};
std::atomic<bool> gImportAllowed{true};

// With a context current: whether it can take imported memory as texture storage.
bool memoryObjectsPresent() {
    static const bool present = [] {
        const EglExtensions& ext = EglExtensions::get();
        return EglExtensions::hasGl("GL_EXT_memory_object_fd") &&
               ext.glCreateMemoryObjectsEXT != nullptr && ext.glDeleteMemoryObjectsEXT != nullptr &&
               ext.glImportMemoryFdEXT != nullptr && ext.glTexStorageMem2DEXT != nullptr;
    }();
    return present;
}

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

bool HostGl::mayImport() {
    return gImportAllowed.load() && gImportState.load() != IMPORT_FAILS;
}

void HostGl::allowImports(bool allowed) {
    gImportAllowed = allowed;
}

GLuint HostGl::importTexture_l(const SharedPixels& pixels, uint32_t width, uint32_t height,
                               GLuint* memoryObject) {
    *memoryObject = 0;
    if (gImportState.load() == IMPORT_UNKNOWN) {
        bool works = probeImport_l();
        gImportState = works ? IMPORT_WORKS : IMPORT_FAILS;
        if (!works) VF_LogMsg(VF_LOG_INFO, "HostGl: no shared texture memory; buffers are copied");
    }
    if (gImportState.load() != IMPORT_WORKS || !gImportAllowed.load()) return 0;
    return import_l(pixels, width, height, memoryObject);
}

GLuint HostGl::import_l(const SharedPixels& pixels, uint32_t width, uint32_t height,
                        GLuint* memoryObject) {
    const EglExtensions& ext = EglExtensions::get();
    if (!memoryObjectsPresent() || pixels.empty()) return 0;
    while (glGetError() != GL_NO_ERROR) {
    }
    int fd = pixels.duplicateFd();
    if (fd < 0) return 0;
    GLuint memory = 0;
    ext.glCreateMemoryObjectsEXT(1, &memory);
    ext.glImportMemoryFdEXT(memory, pixels.fileSize(), GL_HANDLE_TYPE_OPAQUE_FD_EXT, fd);
    if (glGetError() != GL_NO_ERROR) {
        // A refused import leaves the descriptor with us.
        close(fd);
        ext.glDeleteMemoryObjectsEXT(1, &memory);
        return 0;
    }
    GLuint texture = 0;
    glGenTextures(1, &texture);
    glBindTexture(GL_TEXTURE_2D, texture);
    ext.glTexStorageMem2DEXT(GL_TEXTURE_2D, 1, GL_RGBA8_OES, (GLsizei)width, (GLsizei)height,
                             memory, 0);
    setMirrorSampling_l(texture);
    if (glGetError() != GL_NO_ERROR) {
        deleteImported_l(texture, memory);
        return 0;
    }
    *memoryObject = memory;
    return texture;
}

void HostGl::setMirrorSampling_l(GLuint texture) {
    glBindTexture(GL_TEXTURE_2D, texture);
    glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MIN_FILTER, GL_LINEAR);
    glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MAG_FILTER, GL_LINEAR);
    glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_S, GL_CLAMP_TO_EDGE);
    glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_T, GL_CLAMP_TO_EDGE);
    glBindTexture(GL_TEXTURE_2D, 0);
}

void HostGl::deleteImported_l(GLuint texture, GLuint memoryObject) {
    if (texture != 0) glDeleteTextures(1, &texture);
    if (memoryObject != 0 && memoryObjectsPresent()) {
        EglExtensions::get().glDeleteMemoryObjectsEXT(1, &memoryObject);
    }
}

bool HostGl::probeImport_l() {
    // A 5x3 texture: its rows are padded, so a wrong row pitch or row order
    // puts the one cleared texel somewhere else.
    const uint32_t w = 5, h = 3, x = 3, y = 2;
    SharedPixels pixels;
    if (!memoryObjectsPresent() || !pixels.allocate(w, h)) return false;
    GLuint memory = 0;
    GLuint texture = import_l(pixels, w, h, &memory);
    if (texture == 0) return false;
    GLuint framebuffer = framebuffer_l();
    glBindFramebuffer(GL_FRAMEBUFFER, framebuffer);
    glFramebufferTexture2D(GL_FRAMEBUFFER, GL_COLOR_ATTACHMENT0, GL_TEXTURE_2D, texture, 0);
    bool ok = glCheckFramebufferStatus(GL_FRAMEBUFFER) == GL_FRAMEBUFFER_COMPLETE;
    if (ok) {
        glEnable(GL_SCISSOR_TEST);
        glScissor((GLint)x, (GLint)y, 1, 1);
        glClearColor(10 / 255.0f, 20 / 255.0f, 30 / 255.0f, 40 / 255.0f);
        glClear(GL_COLOR_BUFFER_BIT);
        glDisable(GL_SCISSOR_TEST);
        glFinish();
    }
    glFramebufferTexture2D(GL_FRAMEBUFFER, GL_COLOR_ATTACHMENT0, GL_TEXTURE_2D, 0, 0);
    glBindFramebuffer(GL_FRAMEBUFFER, 0);
    const size_t pitch = SharedPixels::rowPitch(w);
    const unsigned char expected[4] = {10, 20, 30, 40};
    for (uint32_t row = 0; ok && row < h; ++row) {
        for (uint32_t col = 0; ok && col < w; ++col) {
            const unsigned char* p = pixels.pixels() + row * pitch + col * 4;
            bool lit = row == y && col == x;
            for (int c = 0; c < 4; ++c) ok = ok && p[c] == (lit ? expected[c] : 0);
        }
    }
    deleteImported_l(texture, memory);
    while (glGetError() != GL_NO_ERROR) {
    }
    return ok;
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
