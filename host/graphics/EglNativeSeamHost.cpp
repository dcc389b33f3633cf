// The host side of the EGL seam: Mesa has no Android windows or buffers, so
// a window surface is an off-screen pbuffer of the window's size whose swap
// copies the frame into a buffer of the window and queues it, and a native
// buffer's image is made from the buffer's GPU mirror texture.
//
// As a device's swap, the host's queues the buffer without reading the
// frame back: the copy into a buffer made for the GPU is a blit into its
// image, and the buffer keeps the blit's fence, which every user of its
// pixels waits for. (llvmpipe itself waits for the frame's draw inside the
// blit, its pbuffers being display targets, so the swap still returns once
// the draw is over; a driver that does not wait returns at once.) Buffers
// for the CPU alone are read back and written before they are queued.
//
// A device's window surface renders each frame into a buffer dequeued at the
// frame's start, so its size follows the window from one frame to the next.
// A pbuffer cannot change size: when the window's size differs at a frame's
// start (a swap, or the first make-current after creation or a swap) the
// pbuffer is replaced by one of the new size and the caller's handle updated.
// A frame already under way when the window changes keeps its size and is
// fitted (cut or padded) into the new buffer; a device would queue it at the
// old size.
#include <string.h>

#include <algorithm>
#include <map>
#include <memory>
#include <mutex>
#include <vector>

#include <GLES2/gl2.h>
#include <GLES3/gl3.h>
#include <stdlib.h>
#include <gui/BufferQueue.h>
#include <system/window.h>
#include <ui/GraphicBuffer.h>

#include "core/egl/EglExtensions.h"
#include "core/egl/EglNativeSeam.h"
#include "HostGl.h"
#include "RasteriserAffinity.h"
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
    void contextCreated(EGLDisplay display) override {
        android::RasteriserAffinity_apply(display);
    }

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
        mWindows[surface] = {window, config, width, height, false, std::make_shared<SwapImages>()};
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
        ANativeWindow* window = target.window.get();
        ANativeWindowBuffer* native = nullptr;
        int fence = -1;
        if (window->dequeueBuffer(window, &native, &fence) != 0 || native == nullptr) {
            VF_LogMsg(VF_LOG_ERROR, "EglNativeSeam: no buffer to swap into");
            return EGL_FALSE;
        }
        GraphicBuffer* buffer = GraphicBuffer::from(native);
        const bool drawn = (buffer->getUsage() & GraphicBuffer::USAGE_HW_MASK) != 0 &&
                           blitFrame(display, target, buffer);
        if (!drawn && !copyFrame(target, buffer)) {
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
        std::shared_ptr<SwapImages> images;
        {
            std::lock_guard<std::mutex> guard(mLock);
            auto found = mWindows.find(surface);
            if (found != mWindows.end()) {
                window = found->second.window;
                images = found->second.images;
                mWindows.erase(found);
            }
        }
        if (images != nullptr) images->clear(*this);
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
    // The images of a window's buffers that swaps blit into, made once per
    // buffer (making one waits for the GPU) and kept while the surface lives
    // and the window keeps the buffer.
    class SwapImages {
    public:
        EGLImageKHR get(EglNativeSeam& seam, EGLDisplay display, GraphicBuffer* buffer) {
            std::lock_guard<std::mutex> guard(mLock);
            for (auto e = mEntries.begin(); e != mEntries.end();) {
                if (e->buffer.get() == buffer && e->display == display) return e->image;
                // The window let this one go (a new size, say): so do we.
                if (e->buffer->getStrongCount() == 1 || mEntries.size() >= kMaxImages) {
                    seam.destroyImage(e->display, e->image);
                    e = mEntries.erase(e);
                } else {
                    ++e;
                }
            }
            EGLImageKHR image = seam.createNativeBufferImage(display, buffer);
            if (image != EGL_NO_IMAGE_KHR) mEntries.push_back({buffer, display, image});
            return image;
        }
        void clear(EglNativeSeam& seam) {
            std::vector<Entry> entries;
            {
                std::lock_guard<std::mutex> guard(mLock);
                entries.swap(mEntries);
            }
            for (const Entry& e : entries) seam.destroyImage(e.display, e.image);
        }

    private:
        static const size_t kMaxImages = android::BufferQueue::NUM_BUFFER_SLOTS;
        struct Entry {
            sp<GraphicBuffer> buffer;
            EGLDisplay display;
            EGLImageKHR image;
        };
        std::mutex mLock;
        std::vector<Entry> mEntries;
    };

    struct WindowSurface {
        sp<ANativeWindow> window;
        EGLConfig config = nullptr;
        int width = 0;
        int height = 0;
        bool frameStarted = false;  // made current since creation or the last swap
        std::shared_ptr<SwapImages> images;
    };

    // Whether the current context can blit between framebuffers (OpenGL ES 3).
    static bool canBlit() {
        const char* version = reinterpret_cast<const char*>(glGetString(GL_VERSION));
        const char* prefix = "OpenGL ES ";
        return version != nullptr && strncmp(version, prefix, strlen(prefix)) == 0 &&
               atoi(version + strlen(prefix)) >= 3;
    }

    // Copies the current frame into the buffer through its image on the GPU
    // (rows flipped: window memory is top row first, GL rows start at the
    // bottom), then fences the copy and hands the fence to the buffer. Parts
    // of the frame outside the buffer are cut; parts of the buffer the frame
    // does not cover keep their pixels. The caller's GL state is kept.
    // False (nothing drawn) when the GL or the buffer cannot take the copy.
    bool blitFrame(EGLDisplay display, const WindowSurface& target, GraphicBuffer* buffer) {
        if (!canBlit()) return false;
        EGLImageKHR image = target.images->get(*this, display, buffer);
        if (image == EGL_NO_IMAGE_KHR) return false;
        while (glGetError() != GL_NO_ERROR) {
        }
        GLint readFramebuffer = 0, drawFramebuffer = 0, renderbuffer = 0;
        glGetIntegerv(GL_READ_FRAMEBUFFER_BINDING, &readFramebuffer);
        glGetIntegerv(GL_DRAW_FRAMEBUFFER_BINDING, &drawFramebuffer);
        glGetIntegerv(GL_RENDERBUFFER_BINDING, &renderbuffer);
        const GLboolean scissor = glIsEnabled(GL_SCISSOR_TEST);
        const GLboolean discard = glIsEnabled(GL_RASTERIZER_DISCARD);
        GLuint storage = 0, framebuffer = 0;
        glGenRenderbuffers(1, &storage);
        glBindRenderbuffer(GL_RENDERBUFFER, storage);
        EglExtensions::get().glEGLImageTargetRenderbufferStorageOES(GL_RENDERBUFFER,
                                                                    (GLeglImageOES)image);
        glGenFramebuffers(1, &framebuffer);
        glBindFramebuffer(GL_DRAW_FRAMEBUFFER, framebuffer);
        glFramebufferRenderbuffer(GL_DRAW_FRAMEBUFFER, GL_COLOR_ATTACHMENT0, GL_RENDERBUFFER,
                                  storage);
        bool ok = glCheckFramebufferStatus(GL_DRAW_FRAMEBUFFER) == GL_FRAMEBUFFER_COMPLETE;
        if (ok) {
            const GLint w = std::min<GLint>(target.width, (GLint)buffer->getWidth());
            const GLint h = std::min<GLint>(target.height, (GLint)buffer->getHeight());
            glBindFramebuffer(GL_READ_FRAMEBUFFER, 0);
            glDisable(GL_SCISSOR_TEST);
            glDisable(GL_RASTERIZER_DISCARD);
            glBlitFramebuffer(0, target.height - h, w, target.height, 0, h, w, 0,
                              GL_COLOR_BUFFER_BIT, GL_NEAREST);
            if (scissor) glEnable(GL_SCISSOR_TEST);
            if (discard) glEnable(GL_RASTERIZER_DISCARD);
        }
        glBindFramebuffer(GL_READ_FRAMEBUFFER, (GLuint)readFramebuffer);
        glBindFramebuffer(GL_DRAW_FRAMEBUFFER, (GLuint)drawFramebuffer);
        glBindRenderbuffer(GL_RENDERBUFFER, (GLuint)renderbuffer);
        glDeleteFramebuffers(1, &framebuffer);
        glDeleteRenderbuffers(1, &storage);
        const GLenum error = glGetError();
        if (!ok || error != GL_NO_ERROR) {
            VF_LogMsg(VF_LOG_ERROR, "EglNativeSeam: cannot blit the frame into its buffer (0x%04x)",
                      error);
            return false;
        }
        EGLSyncKHR fence =
            EglExtensions::get().eglCreateSyncKHR(display, EGL_SYNC_FENCE_KHR, nullptr);
        if (fence != EGL_NO_SYNC_KHR) {
            glFlush();  // the GPU starts on the frame now, not at the next one
        } else {
            glFinish();
        }
        buffer->setGpuWrite(display, fence);
        return true;
    }

    // The frame read back and written into the buffer by the CPU before the
    // swap returns: for buffers the GPU cannot reach.
    static bool copyFrame(const WindowSurface& target, GraphicBuffer* buffer) {
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
        // Window memory is top row first; GL rows start at the bottom.
        return buffer->writeRgbaFrame(frame.data(), target.width, target.height, true) == 0;
    }

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
