#include "core/egl/OpenGLManagerThread.h"

#include <errno.h>
#include <signal.h>
#include <string.h>

#include <GLES2/gl2.h>

#include "core/egl/EglCheck.h"
#include "core/egl/EglClock.h"
#include "core/egl/EglImage.h"
#include "core/egl/EglWindow.h"
#include "core/egl/EglWindowSurface.h"
#include "vccore/vc_error.h"
#include "vccore/vc_log.h"

#define VC_SOURCE "core/egl/OpenGLManager"

using android::Mutex;
using android::sp;

// ANWCondition ---------------------------------------------------------------

ANWCondition::ANWCondition() : mAvailable(false), mConnected(false), mAbandoned(false) {}

ANWCondition::~ANWCondition() {}

void ANWCondition::onANWAvailable() {
    Mutex::Autolock lock(mMutex);
    mAvailable = true;
    mAvailableCondition.signal();
    while (!mConnected && !mAbandoned) mConnectedCondition.wait(mMutex);
    mConnected = false;
}

void ANWCondition::waitAvailable() {
    Mutex::Autolock lock(mMutex);
    while (!mAvailable && !mAbandoned) mAvailableCondition.wait(mMutex);
}

void ANWCondition::setConnected() {
    Mutex::Autolock lock(mMutex);
    mConnected = true;
    mConnectedCondition.signal();
}

void ANWCondition::abandon() {
    Mutex::Autolock lock(mMutex);
    mAbandoned = true;
    mAvailableCondition.broadcast();
    mConnectedCondition.broadcast();
}

// EglRenderWaiter ------------------------------------------------------------

EglRenderWaiter::EglRenderWaiter()
    : mSignalled(false),
      mRenderRequested(false),
      mStartTime(0),
      mPeriod(kPeriodMillis),
      mOvershoot(0) {}

void EglRenderWaiter::reset() {
    Mutex::Autolock lock(mMutex);
    mSignalled = false;
    mRenderRequested = false;
    mStartTime = EglClock::get().uptimeMillis();
    mPeriod = kPeriodMillis;
    mCondition.signal();
}

void EglRenderWaiter::setSignalled() {
    Mutex::Autolock lock(mMutex);
    mSignalled = true;
    mCondition.signal();
}

void EglRenderWaiter::requestRender() {
    Mutex::Autolock lock(mMutex);
    mRenderRequested = true;
    mSignalled = true;
    mCondition.signal();
}

bool EglRenderWaiter::isRenderRequested() {
    Mutex::Autolock lock(mMutex);
    return mRenderRequested;
}

void EglRenderWaiter::wait(int64_t capMillis, bool clearSignal) {
    EglClock& clock = EglClock::get();
    Mutex::Autolock lock(mMutex);
    if (clearSignal) mSignalled = false;
    // A frame that came late makes the next one shorter, so that the
    // average stays one frame per period.
    if (mOvershoot > 0) {
        mPeriod = mPeriod - mOvershoot > 1 ? mPeriod - mOvershoot : 1;
        mOvershoot = 0;
    }
    const int64_t period = mPeriod;
    while (!mSignalled) {
        int64_t elapsed = clock.uptimeMillis() - mStartTime;
        if (elapsed >= period || elapsed >= capMillis) break;
        const int64_t remaining =
            capMillis - elapsed < period - elapsed ? capMillis - elapsed : period - elapsed;
        if (remaining < 2) {
            if (elapsed > period) mOvershoot = elapsed - period > 1 ? (int)(elapsed - period) : 1;
            break;
        }
        clock.waitRelative(mCondition, mMutex, remaining * 1000000);
        elapsed = clock.uptimeMillis() - mStartTime;
        if (elapsed > period) {
            mOvershoot = elapsed - period > 1 ? (int)(elapsed - period) : 1;
            break;
        }
    }
}

// RenderThread ---------------------------------------------------------------

OpenGLManager::RenderThread::RenderThread(const sp<OpenGLManager>& manager)
    : android::Thread(true),
      mFrameCounter(0),
      mRenderWaiter(new EglRenderWaiter()),
      mStopRequested(false),
      mDestroyed(false),
      mMakeCurrentFailures(0),
      mManager(manager),
      mOwner(manager.get()) {}

OpenGLManager::RenderThread::~RenderThread() {}

void OpenGLManager::RenderThread::setANWAvailableListener(
    const sp<ANWAvailableListener>& listener) {
    mListener = listener;
}

android::status_t OpenGLManager::RenderThread::readyToRun() {
    __atomic_store_n(&gOpenGLManagerThread, pthread_self(), __ATOMIC_RELEASE);
    EglLog(VF_LOG_DEBUG, "Creating new OpenGL thread: %lx", (unsigned long)pthread_self());
    OpenGLManager& m = *mManager;
    int status = m.initializeEGLEnv();
    EGL_CLEAR_ERRORS();
    GL_CLEAR_ERRORS();
    if (status == 0) status = m.setCameraSource(0);
    if (status == 0 && m.mCameraLayout == CAMERA_LAYOUT_DUAL) status = m.setCameraSource(1);
    if (status != 0) {
        // The client waiting for the camera windows gets none.
        sp<ANWAvailableListener> listener = mListener;
        if (listener != nullptr) static_cast<ANWCondition*>(listener.get())->abandon();
        // The GL side made so far dies here, on its own thread.
        destroy();
        mManager.clear();
        return status;
    }
    if (mListener != nullptr) mListener->onANWAvailable();
    GL_CHECK(glClearColor(0.0f, 0.0f, 0.0f, 1.0f));
    mFrameCounter = 0;
    EglLog(VF_LOG_DEBUG, "EGL: Ready to run now!");
    return 0;
}

bool OpenGLManager::RenderThread::threadLoop() {
    if (render()) return true;
    mManager.clear();
    return false;
}

bool OpenGLManager::RenderThread::render() {
    OpenGLManager& m = *mManager;
    VFTraceSection trace("KI-render");
    mRenderWaiter->reset();
    const unsigned frame = mFrameCounter.load();
    if (frame == 0) {
        EglLog(VF_LOG_DEBUG, "EGL: render() - initialize");
        if (m.initializeGL() != 0) mStopRequested = true;
    } else if (frame == 1) {
        EglLog(VF_LOG_DEBUG, "EGL: render() - ready");
    }
    EGL_CLEAR_ERRORS();
    if (mStopRequested) {
        destroy();
        return false;
    }

    if (m.mPreviewSurface == nullptr || m.mPreviewSurface->bindSurface() != 0) {
        ++mMakeCurrentFailures;
        EglLog(VF_LOG_ERROR, "EGL: Call to eglMakeCurrent() failed %d time(s)",
               mMakeCurrentFailures);
        if (mMakeCurrentFailures < kMaxMakeCurrentFailures) {
            mRenderWaiter->wait(EglRenderWaiter::kNoCap);
            return true;
        }
        EglLog(VF_LOG_ERROR,
               "EGL ERROR: eglMakeCurrent() failed too many times. Now requesting stop.");
        mStopRequested = true;
        return true;
    }
    if (frame < kUnpacedFrames) mRenderWaiter->setSignalled();

    // A stop asked before the first camera frame must not wait for one.
    const bool first = frame == 0 && !mStopRequested;
    const int dualShot = m.mDualShotMode.load();
    GL_CHECK(glActiveTexture(GL_TEXTURE0));
    if (dualShot == DUAL_SHOT_APPLY) {
        m.updateCameraSource(0, false);
    } else if (dualShot == DUAL_SHOT_STILL_CAMERA0) {
        if (m.mStillImage == nullptr && m.initializeStillImageDualAsync() != 0) return true;
        m.mStillImage->bindTexture();
    } else {
        m.updateCameraSource(0, first);
    }
    if (mStopRequested) return true;

    if (m.mCameraLayout == CAMERA_LAYOUT_DUAL) {
        GL_CHECK(glActiveTexture(GL_TEXTURE1));
        if (dualShot == DUAL_SHOT_APPLY) {
            m.updateCameraSource(1, false);
        } else if (dualShot == DUAL_SHOT_STILL_CAMERA1) {
            if (m.mStillImage == nullptr && m.initializeStillImageDualAsync() != 0) return true;
            m.mStillImage->bindTexture();
        } else {
            m.updateCameraSource(1, first);
        }
        GL_CHECK(glActiveTexture(GL_TEXTURE0));
        if (mStopRequested) return true;
    }

    if (dualShot == DUAL_SHOT_APPLY) {
        if (m.mStillImage != nullptr) m.mStillImage->release();
        m.mStillImage.clear();
        m.applyToPicture(nullptr, nullptr);
        m.mDualShotMode = DUAL_SHOT_NONE;
        if (mStopRequested) return true;
    }

    GL_CHECK(glClear(GL_COLOR_BUFFER_BIT));
    m.onDrawFrame();
    if (!swapBuffers()) {
        EglLog(VF_LOG_ERROR, "EGL: Last call to swapBuffers failed. Now requesting stop.");
        mStopRequested = true;
    }
    if (frame < kUnpacedFrames) mFrameCounter = frame + 1;

    if (mStopRequested) return true;
    m.onDrawFrame_TakePicture();
    if (mStopRequested) return true;
    m.onDrawFrame_Recording();
    if (mStopRequested) return true;

    mRenderWaiter->wait(EglRenderWaiter::kNoCap);
    if (mRenderWaiter->isRenderRequested()) {
        mRenderWaiter->wait(EglRenderWaiter::kRequestedCapMillis, true);
    }
    mMakeCurrentFailures = 0;
    return true;
}

bool OpenGLManager::RenderThread::swapBuffers() {
    OpenGLManager& m = *mManager;
    bool noWindow;
    {
        Mutex::Autolock lock(m.mLock);
        noWindow = m.mPreviewWindow == nullptr;
    }
    if (mStopRequested || noWindow) {
        EglLog(VF_LOG_WARNING,
               "EGL: Not calling eglSwapBuffers as OpenGLManager is being released.");
        return false;
    }
    if (m.mPreviewStopped) return true;
    if (m.mPreviewSurface->swapSurface() != 0) {
        EglLog(VF_LOG_WARNING, "EGL: eglSwapBuffers failed.");
        return false;
    }
    return true;
}

void OpenGLManager::RenderThread::requestRender() {
    if (mFrameCounter.load() < kUnpacedFrames || mOwner->isRecording()) return;
    mRenderWaiter->requestRender();
    mOwner->previewRequestRender();
}

void OpenGLManager::RenderThread::destroy() {
    EglLog(VF_LOG_DEBUG, "In RenderThread::destroy current thread %lx, opengl thread %lx",
           (unsigned long)pthread_self(),
           (unsigned long)__atomic_load_n(&gOpenGLManagerThread, __ATOMIC_ACQUIRE));
    mManager->releaseFromGL();
    mManager->releaseCommon();
    Mutex::Autolock lock(mDestroyMutex);
    mDestroyed = true;
    mDestroyCondition.broadcast();
}

void OpenGLManager::RenderThread::destroyAndWait() {
    mStopRequested = true;
    // A thread still in its start-up handshake goes on to its first render,
    // which sees the stop.
    if (mListener != nullptr) static_cast<ANWCondition*>(mListener.get())->abandon();
    mOwner->previewRequestRender();
    mRenderWaiter->setSignalled();

    EglClock& clock = EglClock::get();
    const int64_t deadline = clock.bootTime() / 1000 + kDestroyTimeoutUs;
    Mutex::Autolock lock(mDestroyMutex);
    bool timedOut = false;
    bool woken = true;
    while (!mDestroyed) {
        if (woken) {
            EglLog(VF_LOG_DEBUG,
                   "EGL: Waiting until render thread and EGL context are destroyed...");
        }
        const int64_t left = deadline - clock.bootTime() / 1000;
        // Nothing left to wait (a wait of nothing would spin).
        if (left <= 0) {
            timedOut = true;
            break;
        }
        // A camera wake that came just before the thread began waiting for
        // its first frame is forgotten by the window: wake it again.
        const int64_t slice = left < 100000 ? left : 100000;
        mDestroyMutex.unlock();
        mOwner->previewRequestRender();
        mDestroyMutex.lock();
        woken =
            mDestroyed || clock.waitRelative(mDestroyCondition, mDestroyMutex, slice * 1000) == 0;
    }
    if (timedOut) {
        EglLog(VF_LOG_ERROR, "EGL ERROR: Timed out while waiting for destroy.");
        const pthread_t thread = __atomic_load_n(&gOpenGLManagerThread, __ATOMIC_ACQUIRE);
        const int probe = thread != 0 ? pthread_kill(thread, 0) : ESRCH;
        if (probe != 0) {
            EglLog(VF_LOG_ERROR, "EGL: Could not signal the thread: %d: %s", probe,
                   strerror(probe));
        } else {
            EglLog(VF_LOG_WARNING,
                   "EGL: The thread is probably still alive, waiting a bit more...");
            int result = 0;
            if (!mDestroyed) {
                result =
                    clock.waitRelative(mDestroyCondition, mDestroyMutex, kDestroyGraceUs * 1000);
            }
            EglLog(VF_LOG_WARNING, "EGL: Waiting returned %d: %s", result, strerror(-result));
        }
    }
    EglLog(VF_LOG_DEBUG, "EGL: RenderThread is finally destroyed!");
}
