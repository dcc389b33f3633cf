// The device side of the EGL seam: Android's EGL takes native windows and
// buffers directly.
#ifdef __ANDROID__

#define EGL_EGLEXT_PROTOTYPES 1

#include "core/egl/EglNativeSeam.h"

#include <system/window.h>
#include <ui/GraphicBuffer.h>

namespace {

class DeviceEglNativeSeam : public EglNativeSeam {
public:
    void prepareDisplay() override {}
    void contextCreated(EGLDisplay) override {}

    EGLSurface createWindowSurface(EGLDisplay display, EGLConfig config, ANativeWindow* window,
                                   const EGLint* attribs) override {
        return eglCreateWindowSurface(display, config, window, attribs);
    }

    EGLBoolean makeCurrent(EGLDisplay display, EGLSurface* surface, EGLContext context) override {
        return eglMakeCurrent(display, *surface, *surface, context);
    }

    EGLBoolean swapBuffers(EGLDisplay display, EGLSurface* surface) override {
        return eglSwapBuffers(display, *surface);
    }

    EGLBoolean destroySurface(EGLDisplay display, EGLSurface surface) override {
        return eglDestroySurface(display, surface);
    }

    EGLImageKHR createNativeBufferImage(EGLDisplay display,
                                        android::GraphicBuffer* buffer) override {
        if (buffer == nullptr) return EGL_NO_IMAGE_KHR;
        const EGLint attribs[] = {EGL_IMAGE_PRESERVED_KHR, EGL_TRUE, EGL_NONE};
        return eglCreateImageKHR(display, EGL_NO_CONTEXT, EGL_NATIVE_BUFFER_ANDROID,
                                 (EGLClientBuffer)buffer->getNativeBuffer(), attribs);
    }

    EGLBoolean destroyImage(EGLDisplay display, EGLImageKHR image) override {
        return eglDestroyImageKHR(display, image);
    }

    const char* shaderText(unsigned int, const char* source, std::string*) override {
        return source;
    }

    // Gralloc memory is reached through locks, not kept mapped: pictures
    // cross through GL here.
    std::unique_ptr<EglSharedPicture> createSharedPicture(int, int) override { return nullptr; }
};

}  // namespace

EglNativeSeam& EglNativeSeam::get() {
    static DeviceEglNativeSeam* seam = new DeviceEglNativeSeam();
    return *seam;
}

#endif
