// Recording: every preview frame (or the frames the interval and motion
// settings pick) drawn a second time, with the same program, into the
// encoder's input surface, which shares the preview's context. The client
// only swaps references and the flag; the render thread builds the GL side
// on the next frame and lets it go on the frame after recording ends.
#include <atomic>

#include <EGL/egl.h>

#include "core/egl/EglCheck.h"
#include "core/egl/EglClock.h"
#include "core/egl/EglEnvironment.h"
#include "core/egl/EglProgram.h"
#include "core/egl/EglWindow.h"
#include "core/egl/EglWindowSurface.h"
#include "core/egl/OpenGLManagerThread.h"
#include "kivimaging/OpenGLManager.h"
#include "vccore/vc_error.h"
#include "vccore/vc_log.h"

#define VC_SOURCE "core/egl/OpenGLManager"

using android::Mutex;
using android::sp;

namespace {

// The last interval frame (ms of uptimeMillis), shared on purpose by every
// manager of the process: two recording at once keep one time-lapse pace.
std::atomic<int64_t> sLastIntervalTime{0};

const char kAbandoned[] = "EGL: It looks like the SurfaceTexture was abandonned. Stopping record.";

}  // namespace

int OpenGLManager::setRecordingSurface(
    const android::sp<android::IGraphicBufferProducer>& producer) {
    {
        Mutex::Autolock lock(mLock);
        EglLog(VF_LOG_DEBUG, "EGL: Called setRecordingSurface: %p", (void*)producer.get());
        if (producer != nullptr) {
            if (mPreviewWindow == nullptr || mProgram == nullptr) {
                EglLog(VF_LOG_ERROR,
                       "EGL: Can't start recording now: preview window is %p and program is %p",
                       (void*)mPreviewWindow.get(), (void*)mProgram.get());
                return VC_REPORT(VC_ERROR_INVALID_STATE);
            }
            // A window of the last recording that the render thread has not
            // let go of yet goes now; its surface keeps the native window.
            if (mRecordingWindow != nullptr) mRecordingWindow->release();
            mRecordingWindow = new EglWindow(producer, mRecordingWidth, mRecordingHeight);
            mRecording = true;
            return 0;
        }
        if (!mRecording) return 0;
        EglLog(VF_LOG_DEBUG, "EGL: Stopping recording now. Releasing recording surface and stuff.");
        mRecording = false;
    }
    // Outside the lock (the wake-up takes it): the render thread lets the GL
    // side go on the frame this asks for.
    requestRender();
    return 0;
}

void OpenGLManager::setRecordingInterval(int ms) {
    EglLog(VF_LOG_DEBUG, "EGL: setRecordingInterval: %d", ms);
    mRecordingInterval = ms;
}

void OpenGLManager::setRecordingMotion(int motion) {
    EglLog(VF_LOG_DEBUG, "EGL: setRecordingMotion: %d", motion);
    if (motion != 0) {
        mRecordingInterval = 0;
        ++mRecordingMotion;
    } else {
        mRecordingMotion = 0;
    }
}

// Render thread, every frame after the picture step.
int OpenGLManager::onDrawFrame_Recording() {
    VFTraceSection trace("KI-Recording");
    bool hasPreview = false;
    {
        // One look under the lock: a client may stop or start again meanwhile.
        Mutex::Autolock lock(mLock);
        hasPreview = mPreviewWindow != nullptr;
        // A producer set again while recording: the surface in place belongs
        // to the window before, so it goes before the new one is built.
        const bool stale = mRecordingSurface != nullptr && mRecordingWindow != nullptr &&
                           mRecordingWindow->getANativeWindow() == nullptr;
        if (mRecordingSurface != nullptr && (!mRecording || stale)) {
            VFTraceSection release("KI-releaseRecording");
            mRecordingSurface->release();
            mRecordingSurface.clear();
            if (!mRecording) {
                if (mRecordingWindow != nullptr) mRecordingWindow->release();
                mRecordingWindow.clear();
                return 0;
            }
        }
    }
    if (!mRecording) return 0;

    if (mRecordingSurface == nullptr) {
        EglLog(VF_LOG_DEBUG, "EGL: Recording window is NULL, creating it now.");
        if (initializeRecording() != 0) {
            // A consumer already gone will not come back: stop asking.
            Mutex::Autolock lock(mLock);
            if (mRecordingWindow != nullptr && mRecordingWindow->getANativeWindow() != nullptr &&
                !mRecordingWindow->checkSurfaceWorking()) {
                EglLog(VF_LOG_WARNING,
                       "EGL: The recording surface has most likely been deleted (NO_INIT). "
                       "Stopping record.");
                mRecording = false;
            }
            return VC_REPORT(VC_ERROR_UNKNOWN);
        }
        sLastIntervalTime = EglClock::get().uptimeMillis();
        return 0;
    }
    if (!hasPreview) return 0;
    {
        Mutex::Autolock lock(mLock);
        if (mRecordingWindow == nullptr || !mRecordingWindow->checkSurfaceWorking()) {
            EglLog(VF_LOG_WARNING,
                   "EGL: The recording surface has most likely been deleted (NO_INIT). Stopping "
                   "record.");
            mRecording = false;
            return 0;
        }
    }

    // Which frames go to the recording.
    const int interval = mRecordingInterval;
    if (interval > 0) {
        const int64_t now = EglClock::get().uptimeMillis();
        if (now - sLastIntervalTime.load() <= interval) return 0;
        EglLog(VF_LOG_DEBUG, "EGL: interval recording");
        sLastIntervalTime = now;
    }
    int motion = mRecordingMotion.load();
    if (motion > 0) {
        // Frames asked for one by one, each taken once.
        while (motion > 0 && !mRecordingMotion.compare_exchange_weak(motion, motion - 1)) {
        }
        if (motion <= 0 && interval == 0) return 0;
    } else if (interval == 0) {
        return 0;
    }

    if (mRecordingSurface->bindSurface() != 0) {
        EglLog(VF_LOG_ERROR, "EGL: Call to eglMakeCurrent() failed [recording]");
        EglLog(VF_LOG_ERROR, "%s", kAbandoned);
        mRecording = false;
        return 0;
    }
    if (mMode == OPENGL_MANAGER_INTERMEDIATE) {
        onDrawFrameMirroring(true);
    } else if (mProgram != nullptr) {
        setupPreviewGeometry(true);
        mProgram->onDrawFrame();
        setupPreviewGeometry(false);
    }
    if (!isRenderThreadRunning()) {
        EglLog(VF_LOG_WARNING,
               "Not calling eglSwapBuffers [record] as OpenGLManager is being released.");
        return VC_REPORT(VC_ERROR_INVALID_STATE);
    }
    bool working;
    {
        Mutex::Autolock lock(mLock);
        working = mRecordingWindow != nullptr && mRecordingWindow->checkSurfaceWorking();
    }
    if (!working) {
        EglLog(VF_LOG_ERROR, "%s", kAbandoned);
        mRecording = false;
        return VC_REPORT(VC_ERROR_UNKNOWN);
    }
    if (mRecordingSurface->swapSurface() != 0) {
        EglLog(VF_LOG_ERROR, "EGL: Call to eglSwapBuffers() failed [recording]");
        mRecording = false;
        return VC_REPORT(VC_ERROR_UNKNOWN);
    }
    return 0;
}

int OpenGLManager::initializeRecording() {
    VFTraceSection trace("KI-initializeRecording");
    if (mEglEnv == nullptr || eglGetCurrentContext() == EGL_NO_CONTEXT) {
        EglLog(VF_LOG_ERROR, "EGL: Display is invalid (EGL_NO_DISPLAY)");
        return VC_ERROR_UNKNOWN;
    }
    sp<ANativeWindow> native;
    {
        // Under the lock: a client setting another producer releases this window.
        Mutex::Autolock lock(mLock);
        if (mRecordingWindow != nullptr && (mRecordingWindow->getANativeWindow() != nullptr ||
                                            mRecordingWindow->initialize() == 0)) {
            native = mRecordingWindow->getANativeWindow();
        }
    }
    if (native == nullptr) return VC_ERROR_UNKNOWN;
    sp<EglWindowSurface> surface =
        new EglWindowSurface(mEglEnv, native, EglWindowSurface::SURFACE_RECORDING);
    if (surface->initialize() != 0 || surface->getEGLSurface() == EGL_NO_SURFACE) {
        if (surface->getEGLSurface() == EGL_NO_SURFACE) {
            EglLog(VF_LOG_ERROR, "EGL: Failed to create the window (but no EGL error was raised).");
        }
        surface->release();
        return VC_ERROR_UNKNOWN;
    }
    if (surface->bindSurface() != 0) {
        surface->release();
        return VC_ERROR_UNKNOWN;
    }
    const int width = surface->getWidth();
    const int height = surface->getHeight();
    EglLog(VF_LOG_DEBUG, "EGL: Recording window size: %dx%d", width, height);
    {
        Mutex::Autolock lock(mLock);
        if (width != mRecordingWidth || height != mRecordingHeight) {
            EglLog(VF_LOG_DEBUG, "EGL: Updated window geometry %dx%d --> %dx%d [%p] (Recording)",
                   mRecordingWidth, mRecordingHeight, width, height, (void*)native.get());
            mRecordingWidth = width;
            mRecordingHeight = height;
        }
        mRecordingSurface = surface;
    }
    if (mMode == OPENGL_MANAGER_INTERMEDIATE) {
        if (!initializeRecordingFBO()) {
            EglLog(VF_LOG_ERROR, "EGL: Failed to reset intermediate FBO!");
            return VC_ERROR_UNKNOWN;
        }
        setupPreviewGeometry(false);
    }
    EglLog(VF_LOG_DEBUG, "EGL: Successfully created surface for recording!");
    return 0;
}
