// The host graphics context: one OpenGL ES 2 context of the host layer, on
// the default EGL display, that owns the GPU mirrors of every GraphicBuffer.
// Any thread may borrow it for a moment (run()), so buffers can be
// synchronised from threads that have no context of their own.
#ifndef KIV_HOST_GRAPHICS_HOSTGL_H
#define KIV_HOST_GRAPHICS_HOSTGL_H

#include <atomic>
#include <functional>
#include <mutex>

#include <EGL/egl.h>
#include <GLES2/gl2.h>

namespace android {

class HostGl {
public:
    static HostGl& get();

    // Selects the headless EGL platform unless the environment chose one.
    static void prepareDisplay();

    // Keeps the context (and a reference on the display) alive while at
    // least one user holds it. acquire() creates it on first use; false when
    // EGL cannot give one.
    bool acquire();
    void release();

    // Runs `work` with the context current on the calling thread, under the
    // context's lock. A context already current on the thread is fenced
    // before (so its pending GL work is done) and restored after; `work` is
    // fenced before the caller's context resumes. False when the context
    // could not be made current or `work` returned false.
    bool run(const std::function<bool()>& work);

    // Waits until all GL work flushed so far, by any context on the display,
    // is done (run() waits only for the caller's own context). False when
    // the context cannot be used.
    bool waitForGpu();

    // Valid while acquired.
    EGLDisplay display() const { return mDisplay; }
    EGLContext context() const { return mContext; }

    // Framebuffer of the context, for read-backs and clears (made on first
    // use, in run()).
    GLuint framebuffer_l();

    // Called (on the terminating thread, no lock held) when every other user
    // of the display this context lives on has terminated it, so that what
    // the host layer keeps only for those users can be let go; the context
    // then ends with its own last user, and the display with it.
    static void setDisplayIdleHook(void (*hook)());
    // From eglTerminate: `display` has one reference left.
    void onOneDisplayReferenceLeft(EGLDisplay display);
    // Whether anyone but this context holds the display it lives on (false
    // when there is no context).
    bool displayHasOtherUsers() const;

private:
    HostGl();
    bool create_l();
    void destroy_l();
    void fenceCurrent(EGLDisplay display);
    // run() without the lock or the user check.
    bool visit_l(const std::function<bool()>& work);
    // With the context current: keeps the shader compiler loaded (see .cpp).
    void holdCompiler_l();

    std::mutex mLock;
    int mUsers;
    EGLDisplay mDisplay;
    EGLContext mContext;
    EGLSurface mSurface;
    GLuint mFramebuffer;
    bool mCompilerResident;
    // The display this context holds a reference on, readable without the
    // lock (eglTerminate is called under it).
    std::atomic<EGLDisplay> mHeldDisplay;
    bool mFences;  // the display has EGL_KHR_fence_sync
};

}  // namespace android

#endif
