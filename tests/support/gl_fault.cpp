#include "support/gl_fault.h"

#include <dlfcn.h>

#include <atomic>

#include <EGL/egl.h>
#include <GLES2/gl2.h>

#include "host/ui/GraphicBufferTestSeam.h"

namespace {

std::atomic<int> gProgramFaults{0};
std::atomic<int> gReadFaults{0};
std::atomic<int> gReadsBeforeFaults{0};
std::atomic<int> gDrawFaults{0};
std::atomic<int> gMakeCurrentFaults{0};
std::atomic<int> gMakeCurrentWidth{0};
std::atomic<int> gMakeCurrentHeight{0};
std::atomic<long> gObjectBalance{0};

// No size asked, or the surface's.
bool sizeMatches(EGLDisplay display, EGLSurface surface) {
    const int width = gMakeCurrentWidth.load(), height = gMakeCurrentHeight.load();
    if (width == 0) return true;
    EGLint w = 0, h = 0;
    return eglQuerySurface(display, surface, EGL_WIDTH, &w) && w == width &&
           eglQuerySurface(display, surface, EGL_HEIGHT, &h) && h == height;
}

// Takes one armed fault, if any is left.
bool takeFault(std::atomic<int>& faults) {
    int left = faults.load();
    while (left > 0) {
        if (faults.compare_exchange_weak(left, left - 1)) return true;
    }
    return false;
}

template <typename T>
T driver(const char* name) {
    return reinterpret_cast<T>(dlsym(RTLD_NEXT, name));
}

}  // namespace

void GlFault_failProgramCreations(int count) {
    gProgramFaults = count;
}

void GlFault_failPictureReads(int count, int after) {
    gReadsBeforeFaults = after;
    gReadFaults = count;
    // Host buffers that share their storage with the GPU have no read-back
    // to fail: while armed, new ones copy through GL.
    android::GraphicBufferTestSeam::allowSharedStorage(count == 0);
}

void GlFault_skipDraws(int count) {
    gDrawFaults = count;
}

void GlFault_failMakeCurrents(int count, int width, int height) {
    gMakeCurrentWidth = width;
    gMakeCurrentHeight = height;
    gMakeCurrentFaults = count;
}

long GlFault_objectBalance() {
    return gObjectBalance.load();
}

extern "C" GLuint glCreateProgram() {
    static const auto next = driver<GLuint (*)()>("glCreateProgram");
    if (takeFault(gProgramFaults)) return 0;
    const GLuint program = next();
    gObjectBalance += program != 0;
    return program;
}

extern "C" void glReadPixels(GLint x, GLint y, GLsizei width, GLsizei height, GLenum format,
                             GLenum type, void* pixels) {
    static const auto next =
        driver<void (*)(GLint, GLint, GLsizei, GLsizei, GLenum, GLenum, void*)>("glReadPixels");
    if ((long)width * height > 1 && !takeFault(gReadsBeforeFaults) && takeFault(gReadFaults))
        width = -1;
    next(x, y, width, height, format, type, pixels);
}

extern "C" void glDrawArrays(GLenum mode, GLint first, GLsizei count) {
    static const auto next = driver<void (*)(GLenum, GLint, GLsizei)>("glDrawArrays");
    if (!takeFault(gDrawFaults)) next(mode, first, count);
}

extern "C" EGLBoolean eglMakeCurrent(EGLDisplay display, EGLSurface draw, EGLSurface read,
                                     EGLContext context) {
    static const auto next =
        driver<EGLBoolean (*)(EGLDisplay, EGLSurface, EGLSurface, EGLContext)>("eglMakeCurrent");
    if (context != EGL_NO_CONTEXT && draw != EGL_NO_SURFACE && gMakeCurrentFaults.load() > 0 &&
        sizeMatches(display, draw) && takeFault(gMakeCurrentFaults)) {
        // The error eglGetError() reports next, as the driver would set it.
        static const auto bad =
            driver<EGLBoolean (*)(EGLDisplay, EGLSurface, EGLSurface, EGLContext)>(
                "eglMakeCurrent");
        bad(display, (EGLSurface)(intptr_t)-1, (EGLSurface)(intptr_t)-1, context);
        return EGL_FALSE;
    }
    return next(display, draw, read, context);
}

// Object counts: names made, and non-zero names deleted.
namespace {
void countDeleted(GLsizei n, const GLuint* names) {
    for (GLsizei i = 0; i < n && names != nullptr; ++i) gObjectBalance -= names[i] != 0;
}
}  // namespace

#define KIV_COUNT_GEN(gen, del)                                                              \
    extern "C" void gen(GLsizei n, GLuint* names) {                                          \
        static const auto next = driver<void (*)(GLsizei, GLuint*)>(#gen);                   \
        next(n, names);                                                                      \
        for (GLsizei i = 0; i < n && names != nullptr; ++i) gObjectBalance += names[i] != 0; \
    }                                                                                        \
    extern "C" void del(GLsizei n, const GLuint* names) {                                    \
        static const auto next = driver<void (*)(GLsizei, const GLuint*)>(#del);             \
        countDeleted(n, names);                                                              \
        next(n, names);                                                                      \
    }
KIV_COUNT_GEN(glGenTextures, glDeleteTextures)
KIV_COUNT_GEN(glGenFramebuffers, glDeleteFramebuffers)
KIV_COUNT_GEN(glGenRenderbuffers, glDeleteRenderbuffers)
KIV_COUNT_GEN(glGenBuffers, glDeleteBuffers)

extern "C" void glDeleteProgram(GLuint program) {
    static const auto next = driver<void (*)(GLuint)>("glDeleteProgram");
    gObjectBalance -= program != 0;
    next(program);
}

extern "C" GLuint glCreateShader(GLenum type) {
    static const auto next = driver<GLuint (*)(GLenum)>("glCreateShader");
    const GLuint shader = next(type);
    gObjectBalance += shader != 0;
    return shader;
}

extern "C" void glDeleteShader(GLuint shader) {
    static const auto next = driver<void (*)(GLuint)>("glDeleteShader");
    gObjectBalance -= shader != 0;
    next(shader);
}
