// The two EGL operations that differ between a device and a Linux host:
// a window surface on an ANativeWindow and an EGL image over a native buffer.
// A device uses the plain EGL calls (eglCreateWindowSurface,
// EGL_NATIVE_BUFFER_ANDROID); a host has no native windows or buffers in its
// EGL, so it renders into an off-screen surface of the window's size whose
// swap queues the frame into the window, and makes images from the buffer's
// mirror texture. Nothing else in core/ knows which side it runs on.
#ifndef CORE_EGL_EGLNATIVESEAM_H
#define CORE_EGL_EGLNATIVESEAM_H

#include <EGL/egl.h>
#include <EGL/eglext.h>
#include <GLES2/gl2.h>
#include <stddef.h>

#include <memory>
#include <string>

struct ANativeWindow;
namespace android {
class GraphicBuffer;
}

// A picture-sized RGBA GL_TEXTURE_2D of the current context whose storage
// the CPU reaches directly, so that a picture can cross a band of rows at a
// time: the CPU writes rows the GPU samples later, or reads rows the GPU has
// rendered (after a glFinish), without a GL transfer. Memory is only taken
// by rows that are touched, and rows below a point can be given back.
// Created and destroyed with its context current.
class EglSharedPicture {
public:
    virtual ~EglSharedPicture() = default;
    virtual GLuint texture() const = 0;
    // Row `y` (row 0 is the first of the picture and of GL's rows);
    // rows are pitch() bytes apart.
    virtual unsigned char* row(int y) const = 0;
    virtual size_t pitch() const = 0;
    // Rows [0, y) will not be used again: their memory may be given back
    // (they then read as zeros).
    virtual void discardRowsBelow(int y) = 0;
    // For rows used once from top to bottom: only `slots` bands of
    // `bandRows` rows hold memory, which they take in turns, so that a large
    // picture neither allocates nor gives back memory band after band.
    // False where the picture cannot (rows are then discarded as usual).
    virtual bool useBandRing(int bandRows, int slots) {
        (void)bandRows;
        (void)slots;
        return false;
    }
    // With a ring, before any row of band `band` is touched: band
    // `band - slots`, which nobody may use any more, gives it its memory
    // (and reads as zeros after). False when the memory could not move.
    virtual bool takeBand(int band) {
        (void)band;
        return false;
    }
};

class EglNativeSeam {
public:
    // The implementation linked into this build.
    static EglNativeSeam& get();

    virtual ~EglNativeSeam() = default;

    // Called before the first eglGetDisplay (a headless host selects its EGL
    // platform here).
    virtual void prepareDisplay() = 0;
    // Called after each context of `display` is created (a host settles its
    // software GPU's threads, which exist from the first context on).
    virtual void contextCreated(EGLDisplay display) = 0;

    virtual EGLSurface createWindowSurface(EGLDisplay display, EGLConfig config,
                                           ANativeWindow* window, const EGLint* attribs) = 0;
    // Make `context` current on *surface for drawing and reading, and post a
    // window surface's frame. A window surface follows its window's size as on
    // a device: a frame takes the window's size when it starts (at the first
    // make-current after creation or after a swap). A host does that by
    // replacing its off-screen surface, so *surface may change; any surface
    // (pbuffers too) may be passed.
    virtual EGLBoolean makeCurrent(EGLDisplay display, EGLSurface* surface, EGLContext context) = 0;
    virtual EGLBoolean swapBuffers(EGLDisplay display, EGLSurface* surface) = 0;
    virtual EGLBoolean destroySurface(EGLDisplay display, EGLSurface surface) = 0;

    // An EGL image over the buffer's pixels, usable as an external texture or
    // a renderbuffer; EGL_NO_IMAGE_KHR on failure (eglGetError tells why).
    virtual EGLImageKHR createNativeBufferImage(EGLDisplay display,
                                                android::GraphicBuffer* buffer) = 0;
    virtual EGLBoolean destroyImage(EGLDisplay display, EGLImageKHR image) = 0;

    // With a context current: the text GL compiles for a shader of `type`
    // whose library text is `source`. A device compiles `source` as it is; a
    // host whose mediump float is 16-bit (and slow) compiles it with highp.
    // An adapted text lives in *storage.
    virtual const char* shaderText(unsigned int type, const char* source, std::string* storage) = 0;

    // With a context current: a shared picture, or null where the GL cannot
    // take CPU memory as texture storage (callers then copy through GL).
    virtual std::unique_ptr<EglSharedPicture> createSharedPicture(int width, int height) = 0;
};

#endif
