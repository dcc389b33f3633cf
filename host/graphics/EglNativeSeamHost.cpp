// The host side of the EGL seam: Mesa has no Android windows or buffers, so
// a window surface is an off-screen pbuffer of the window's size whose swap
// copies the frame into a buffer of the window and queues it, and a native
// buffer's image is made from the buffer's GPU mirror texture.
//
// A device's window surface renders each frame into a buffer dequeued at the
// frame's start, so its size follows the window from one frame to the next.
// A pbuffer cannot change size: when the window's size differs at a frame's
// start (a swap, or the first make-current after creation or a swap) the
// pbuffer is replaced by one of the new size and the caller's handle updated.
// A frame already under way when the window changes keeps its size and is
// fitted (cut or padded) into the new buffer; a device would queue it at the
// old size.
#include <map>
#include <mutex>
#include <vector>

#include <GLES2/gl2.h>
#include <system/window.h>
#include <ui/GraphicBuffer.h>

#include "core/egl/EglExtensions.h"
#include "core/egl/EglNativeSeam.h"
#include "HostGl.h"
#include "ShaderPrecision.h"
#include "SharedPixels.h"
#include "vccore/vc_log.h"

namespace {

using android::GraphicBuffer;
using android::sp;

bool windowSize(ANativeWindow* window, int* width, int* height) {
    return window->query(window, NATIVE_WINDOW_WIDTH, width) == 0 &&
           window->query(window, NATIVE_WINDOW_HEIGHT, height) == 0 && *width > 0 && *height > 0;
}

EGLSurface createPbuffer(EGLDisplay display, EGLConfig config, int width, int height) {
    const EGLint attribs[] = {EGL_WIDTH, width, EGL_HEIGHT, height, EGL_NONE};
    return eglCreatePbufferSurface(display, config, attribs);
}

// A texture of the current context on a memory file the CPU keeps mapped.
class HostSharedPicture : public EglSharedPicture {
public:
    ~HostSharedPicture() override { android::SharedPixels::deleteImported(mTexture, mMemory); }
    bool make(int width, int height) {
        return mPixels.allocate((uint32_t)width, (uint32_t)height) &&
               (mTexture = mPixels.importTexture(&mMemory)) != 0;
    }
    GLuint texture() const override { return mTexture; }
    unsigned char* row(int y) const override { return mPixels.pixels() + (size_t)y * pitch(); }
    size_t pitch() const override { return android::SharedPixels::rowPitch(mPixels.width()); }
    void discardRowsBelow(int y) override { mPixels.discardBelow((size_t)y * pitch()); }
    bool useBandRing(int bandRows, int slots) override {
        return mPixels.useRing((size_t)bandRows * pitch(), slots);
    }
    bool takeBand(int band) override { return mPixels.takePart(band); }

private:
    android::SharedPixels mPixels;
    GLuint mTexture = 0;
    GLuint mMemory = 0;
};

class HostEglNativeSeam : public EglNativeSeam {
public:
    void prepareDisplay() override { android::HostGl::prepareDisplay(); }

    EGLSurface createWindowSurface(EGLDisplay display, EGLConfig config, ANativeWindow* window,
                                   const EGLint* /*attribs*/) override {
        if (window == nullptr) return EGL_NO_SURFACE;
        int width = 0;
        int height = 0;
        if (!windowSize(window, &width, &height)) {
            VF_LogMsg(VF_LOG_ERROR, "EglNativeSeam: window without a size");
            return EGL_NO_SURFACE;
        }
        if (native_window_api_connect(window, NATIVE_WINDOW_API_EGL) != 0) {
            VF_LogMsg(VF_LOG_ERROR, "EglNativeSeam: window already connected");
            return EGL_NO_SURFACE;
        }
        EGLSurface surface = createPbuffer(display, config, width, height);
        if (surface == EGL_NO_SURFACE) {
            native_window_api_disconnect(window, NATIVE_WINDOW_API_EGL);
            return EGL_NO_SURFACE;
        }
        std::lock_guard<std::mutex> guard(mLock);
        mWindows[surface] = {window, config, width, height, false};
        return surface;
    }

    EGLBoolean makeCurrent(EGLDisplay display, EGLSurface* surface, EGLContext context) override {
        bool frameStart = false;
        {
            std::lock_guard<std::mutex> guard(mLock);
            auto found = mWindows.find(*surface);
            frameStart = found != mWindows.end() && !found->second.frameStarted;
        }
        if (frameStart) followWindow(display, surface);
        EGLBoolean result = eglMakeCurrent(display, *surface, *surface, context);
        if (result == EGL_TRUE && frameStart) {
            std::lock_guard<std::mutex> guard(mLock);
            auto found = mWindows.find(*surface);
            if (found != mWindows.end()) found->second.frameStarted = true;
        }
        return result;
    }

    EGLBoolean swapBuffers(EGLDisplay display, EGLSurface* surface) override {
        WindowSurface target;
        {
            std::lock_guard<std::mutex> guard(mLock);
            auto found = mWindows.find(*surface);
            if (found == mWindows.end()) return eglSwapBuffers(display, *surface);
            target = found->second;
        }
        // The frame is read from the surface, so it has to be the current one.
        if (eglGetCurrentSurface(EGL_DRAW) != *surface) {
            VF_LogMsg(VF_LOG_ERROR, "EglNativeSeam: swap of a surface that is not current");
            return EGL_FALSE;
        }
        // Kept by the thread that swaps: a fresh frame every swap costs a
        // page fault a page.
        thread_local std::vector<unsigned char> frame;
        frame.resize((size_t)target.width * target.height * 4);
        GLint framebuffer = 0;
        GLint alignment = 4;
        glGetIntegerv(GL_FRAMEBUFFER_BINDING, &framebuffer);
        glGetIntegerv(GL_PACK_ALIGNMENT, &alignment);
        glBindFramebuffer(GL_FRAMEBUFFER, 0);
        glPixelStorei(GL_PACK_ALIGNMENT, 4);
        glReadPixels(0, 0, target.width, target.height, GL_RGBA, GL_UNSIGNED_BYTE, frame.data());
        glPixelStorei(GL_PACK_ALIGNMENT, alignment);
        glBindFramebuffer(GL_FRAMEBUFFER, (GLuint)framebuffer);

        ANativeWindow* window = target.window.get();
        ANativeWindowBuffer* native = nullptr;
        int fence = -1;
        if (window->dequeueBuffer(window, &native, &fence) != 0 || native == nullptr) {
            VF_LogMsg(VF_LOG_ERROR, "EglNativeSeam: no buffer to swap into");
            return EGL_FALSE;
        }
        // Window memory is top row first; GL rows start at the bottom.
        GraphicBuffer* buffer = GraphicBuffer::from(native);
        if (buffer->writeRgbaFrame(frame.data(), target.width, target.height, true) != 0) {
            window->cancelBuffer(window, native, -1);
            return EGL_FALSE;
        }
        if (window->queueBuffer(window, native, -1) != 0) return EGL_FALSE;
        // The next frame starts here, drawn without another make-current.
        {
            std::lock_guard<std::mutex> guard(mLock);
            auto found = mWindows.find(*surface);
            if (found != mWindows.end()) found->second.frameStarted = false;
        }
        followWindow(display, surface);
        return EGL_TRUE;
    }

    EGLBoolean destroySurface(EGLDisplay display, EGLSurface surface) override {
        sp<ANativeWindow> window;
        {
            std::lock_guard<std::mutex> guard(mLock);
            auto found = mWindows.find(surface);
            if (found != mWindows.end()) {
                window = found->second.window;
                mWindows.erase(found);
            }
        }
        if (window != nullptr) native_window_api_disconnect(window.get(), NATIVE_WINDOW_API_EGL);
        return eglDestroySurface(display, surface);
    }

    EGLImageKHR createNativeBufferImage(EGLDisplay display, GraphicBuffer* buffer) override {
        if (buffer == nullptr) return EGL_NO_IMAGE_KHR;
        EGLImageKHR image = buffer->createEglImage(display);
        if (image == EGL_NO_IMAGE_KHR) return image;
        std::lock_guard<std::mutex> guard(mLock);
        mImages[image] = buffer;  // the image keeps its buffer alive, as on a device
        return image;
    }

    EGLBoolean destroyImage(EGLDisplay display, EGLImageKHR image) override {
        EGLBoolean result = EglExtensions::get().eglDestroyImageKHR(display, image);
        sp<GraphicBuffer> buffer;
        {
            std::lock_guard<std::mutex> guard(mLock);
            auto found = mImages.find(image);
            if (found != mImages.end()) {
                buffer = found->second;
                mImages.erase(found);
            }
        }
        if (buffer != nullptr) buffer->onEglImageDestroyed();
        return result;
    }

    const char* shaderText(unsigned int type, const char* source, std::string* storage) override {
        return android::ShaderPrecision_promotes(type)
                   ? android::ShaderPrecision_highp(source, storage)
                   : source;
    }

    std::unique_ptr<EglSharedPicture> createSharedPicture(int width, int height) override {
        if (width < 1 || height < 1) return nullptr;
        std::unique_ptr<HostSharedPicture> picture(new HostSharedPicture());
        if (!picture->make(width, height)) return nullptr;
        glBindTexture(GL_TEXTURE_2D, 0);
        return std::unique_ptr<EglSharedPicture>(picture.release());
    }

private:
    struct WindowSurface {
        sp<ANativeWindow> window;
        EGLConfig config = nullptr;
        int width = 0;
        int height = 0;
        bool frameStarted = false;  // made current since creation or the last swap
    };

    // When the window's size differs from the surface's, replaces *surface by a
    // pbuffer of the window's size; a context drawing into the old one on this
    // thread moves to it. Otherwise, or when that fails (logged, the EGL error
    // taken), *surface stays as it is.
    void followWindow(EGLDisplay display, EGLSurface* surface) {
        WindowSurface entry;
        {
            std::lock_guard<std::mutex> guard(mLock);
            auto found = mWindows.find(*surface);
            if (found == mWindows.end()) return;
            entry = found->second;
        }
        int width = 0;
        int height = 0;
        if (!windowSize(entry.window.get(), &width, &height)) return;
        if (width == entry.width && height == entry.height) return;
        EGLSurface resized = createPbuffer(display, entry.config, width, height);
        bool current = eglGetCurrentSurface(EGL_DRAW) == *surface;
        if (resized == EGL_NO_SURFACE ||
            (current && !eglMakeCurrent(display, resized, resized, eglGetCurrentContext()))) {
            VF_LogMsg(VF_LOG_ERROR,
                      "EglNativeSeam: cannot resize a %dx%d window surface to %dx%d (0x%04x)",
                      entry.width, entry.height, width, height, eglGetError());
            if (resized != EGL_NO_SURFACE) eglDestroySurface(display, resized);
            return;
        }
        eglDestroySurface(display, *surface);
        entry.width = width;
        entry.height = height;
        std::lock_guard<std::mutex> guard(mLock);
        mWindows.erase(*surface);
        mWindows[resized] = entry;
        *surface = resized;
    }

    std::mutex mLock;
    std::map<EGLSurface, WindowSurface> mWindows;
    std::map<EGLImageKHR, sp<GraphicBuffer>> mImages;
};

}  // namespace

EglNativeSeam& EglNativeSeam::get() {
    static HostEglNativeSeam* seam = new HostEglNativeSeam();
    return *seam;
}
