// The render manager's thread and the two small rendezvous it uses: the
// start-up handshake with the client (ANWCondition) and the frame pacing
// (EglRenderWaiter). The waits go through EglClock.
#ifndef CORE_EGL_OPENGLMANAGERTHREAD_H
#define CORE_EGL_OPENGLMANAGERTHREAD_H

#include <pthread.h>
#include <stdint.h>

#include <atomic>

#include <utils/Condition.h>
#include <utils/Mutex.h>
#include <utils/RefBase.h>
#include <utils/Thread.h>

#include "kivimaging/OpenGLManager.h"

// Releases a GL-side object (render thread) and drops the reference.
template <class T>
void releaseAndClear(android::sp<T>& object) {
    if (object != nullptr) object->release();
    object.clear();
}

// The latest GL-owning thread (defined with the buffered processor, which
// records its own); for logging and the liveness probe of a destroy that
// does not finish. The render thread reads and writes it atomically.
extern pthread_t gOpenGLManagerThread;

class ANWAvailableListener : public virtual android::RefBase {
public:
    // Render thread: the camera windows exist.
    virtual void onANWAvailable() = 0;
    ~ANWAvailableListener() override {}
};

class ANWCondition : public ANWAvailableListener {
public:
    ANWCondition();
    // Render thread: announces the windows, then blocks until the client
    // says the camera is connected (or the manager gives up).
    void onANWAvailable() override;
    ~ANWCondition() override;

    // Client: blocks until the render thread announced the windows, or
    // start-up failed.
    void waitAvailable();
    void setConnected();
    // Neither side waits any more: start-up failed, or the manager is
    // being released before the client connected.
    void abandon();

private:
    bool mAvailable;
    bool mConnected;
    bool mAbandoned;
    android::Mutex mMutex;
    android::Condition mAvailableCondition;
    android::Condition mConnectedCondition;
};

class EglRenderWaiter : public virtual android::RefBase {
public:
    static const int kPeriodMillis = 41;
    // A requested render comes at most this soon after the last one began.
    static const int kRequestedCapMillis = 16;
    static const int64_t kNoCap = INT64_MAX;

    EglRenderWaiter();
    // Start of a frame: not signalled, no render requested, period 41 ms
    // from now.
    void reset();
    // Ends the current and the next wait at once.
    void setSignalled();
    void requestRender();
    bool isRenderRequested();
    // Until the period (shortened by the last overshoot) or `capMillis` has
    // passed since reset(), or until signalled. `clearSignal` first forgets
    // a signal already given (the second wait of a requested render).
    void wait(int64_t capMillis, bool clearSignal = false);

private:
    android::Mutex mMutex;
    android::Condition mCondition;
    bool mSignalled;
    bool mRenderRequested;
    int64_t mStartTime;  // ms of uptimeMillis
    int mPeriod;
    int mOvershoot;
};

class OpenGLManager::RenderThread : public android::Thread {
public:
    static const unsigned kUnpacedFrames = 10;
    static const int kMaxMakeCurrentFailures = 50;
    // How long release() waits for the thread to free the GL side, then
    // once more if it still seems alive.
    static const int64_t kDestroyTimeoutUs = 2500000;
    static const int64_t kDestroyGraceUs = 250000;

    explicit RenderThread(const android::sp<OpenGLManager>& manager);
    ~RenderThread() override;

    void setANWAvailableListener(const android::sp<ANWAvailableListener>& listener);
    void requestRender();
    // Client thread: asks the thread to stop and waits (bounded) until it
    // has freed the GL side.
    void destroyAndWait();
    bool isStopRequested() const { return mStopRequested.load(); }
    unsigned getFrameCounter() const { return mFrameCounter.load(); }

private:
    android::status_t readyToRun() override;
    bool threadLoop() override;
    bool render();
    bool swapBuffers();
    void destroy();

    std::atomic<unsigned> mFrameCounter;
    android::sp<EglRenderWaiter> mRenderWaiter;
    std::atomic<bool> mStopRequested;
    bool mDestroyed;  // under mDestroyMutex
    int mMakeCurrentFailures;
    // Keeps the manager alive while the thread runs; the thread lets go of
    // it itself as it ends (its own object may outlive the join).
    android::sp<OpenGLManager> mManager;
    // The same manager for calls from client threads, which hold it.
    OpenGLManager* const mOwner;
    android::sp<ANWAvailableListener> mListener;
    android::Mutex mDestroyMutex;
    android::Condition mDestroyCondition;
};

#endif
