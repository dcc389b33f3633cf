// Still output of the render manager: full-resolution pictures through the
// current effect, snapshots and screenshots of the rendered effect, and the
// dual-shot still that stands in for a live camera.
#include <stdint.h>

#include <GLES2/gl2.h>

#include "core/egl/AsyncImageConverter.h"
#include "core/egl/EglCheck.h"
#include "core/egl/EglClock.h"
#include "core/egl/EglEnvironment.h"
#include "core/egl/EglImage.h"
#include "core/egl/EglProgram.h"
#include "core/egl/EglSnapShot.h"
#include "core/egl/EglSnapShotLite.h"
#include "core/egl/EglWindow.h"
#include "core/egl/EglWindowSurface.h"
#include "core/egl/OpenGLManagerThread.h"
#include "kivimaging/OpenGLManager.h"
#include "vccore/vc_error.h"
#include "vccore/vc_image.h"
#include "vccore/vc_log.h"

#define VC_SOURCE "core/egl/OpenGLManager"

using android::Mutex;
using android::sp;

namespace {

// A failed capture is logged where it fails; the client also hears of it,
// so that it does not wait for a picture that will not come.
void notifyFailure(OnFrameListener& listener, int code, const char* message) {
    EglLog(VF_LOG_ERROR, "%s", message);
    listener.onProcessingError(code, message);
}

}  // namespace

int OpenGLManager::applyToPicture(VCImage* base, VCImage* pip) {
    EglLog(VF_LOG_ERROR, "EGL: OpenGLManager::applyToPicture %x, %x", (unsigned)(uintptr_t)base,
           (unsigned)(uintptr_t)pip);
    VFTraceSection trace("KI-applyToPicture");
    if (!isRenderThreadRunning()) {
        EglLog(VF_LOG_ERROR, "In %s, OpenGLManager is already stopped! Can not take a picture.",
               "applyToPicture");
        return VC_REPORT(VC_ERROR_INVALID_STATE);
    }
    if (mPictureListener.load() == nullptr) {
        EglLog(VF_LOG_ERROR, "In %s, no picture listener was set. Aborting.", "applyToPicture");
        return VC_REPORT(VC_ERROR_INVALID_STATE);
    }
    VCImage *oldBase, *oldPip;
    {
        Mutex::Autolock pictures(mPictureLock);
        Mutex::Autolock state(mStateLock);
        oldBase = mBasePicture;
        oldPip = mPipPicture;
        mBasePicture = base;
        mPipPicture = pip;
    }
    if (oldBase != base) VCImage_destroy(oldBase);
    if (oldPip != pip) VCImage_destroy(oldPip);
    return 0;
}

int OpenGLManager::onDrawFrame_TakePicture() {
    // One attempt per request: a failed capture is not retried, and a
    // request made while this one runs is served on the next frame.
    const int request = mCaptureRequest.exchange(CAPTURE_NONE);
    if (request == CAPTURE_NONE) return 0;
    OnFrameListener* listener = mPictureListener.load();
    if (listener == nullptr) {
        EglLog(VF_LOG_ERROR, "In %s, no picture listener was set. Aborting.",
               "onDrawFrame_TakePicture");
        return VC_REPORT(VC_ERROR_INVALID_STATE);
    }
    int status;
    switch (request) {
        case CAPTURE_PICTURE:
            status = takePicture(*listener);
            break;
        case CAPTURE_SNAPSHOT:
            status = takeSnapshot(*listener, false);
            break;
        case CAPTURE_SCREENSHOT:
            status = takeSnapshot(*listener, true);
            break;
        default:
            EglLog(VF_LOG_ERROR, "EGL: unknown capture request %d", request);
            status = VC_REPORT(VC_ERROR_INVALID_PARAM);
            listener->onProcessingError(status, "Unknown capture request");
            break;
    }
    setupPreviewGeometry(false);
    return status;
}

int OpenGLManager::takePicture(OnFrameListener& listener) {
    EglLog(VF_LOG_DEBUG, "EGL: Taking a picture");
    VFTraceSection trace("KI-TAKEPICTURE");
    Mutex::Autolock pictures(mPictureLock);
    int status;
    {
        VFTraceSection init("KI-TAKEPICTURE_INIT");
        status = setupPictureEnv(mBasePicture, mPipPicture);
    }
    if (status != 0) {
        EglLog(VF_LOG_ERROR,
               "Could not setup a new GL environnment for a picture of size %dx%d '%4.4s'",
               mBasePicture != nullptr ? mBasePicture->width : 0,
               mBasePicture != nullptr ? mBasePicture->height : 0,
               mBasePicture != nullptr ? (const char*)&mBasePicture->format : "????");
        {
            Mutex::Autolock state(mStateLock);
            VCImage_destroy(mBasePicture);
            VCImage_destroy(mPipPicture);
            mBasePicture = nullptr;
            mPipPicture = nullptr;
        }
        notifyFailure(listener, status, "Failed to setup picture program and buffers");
        return status;
    }
    // A picture without data is the camera's current frame.
    const bool dual = mCameraLayout / 10 == 2;
    VCImage* base = mBasePicture->data != nullptr ? nullptr : previewPicture(0);
    VCImage* pip = !dual || mPipPicture->data != nullptr ? nullptr : previewPicture(1);
    status = mSnapShot->takePictureSync(base != nullptr ? base : mBasePicture,
                                        dual ? (pip != nullptr ? pip : mPipPicture) : nullptr,
                                        mProgram, listener, EglClock::get().bootTime());
    VCImage_destroy(base);
    VCImage_destroy(pip);
    if (status != 0) {
        EglLog(VF_LOG_ERROR, "Failed to pass a picture to OpenGL: %d", status);
        notifyFailure(listener, status, "Failed to take a picture");
    }
    return status;
}

VCImage* OpenGLManager::previewPicture(int id) {
    const sp<EglWindow>& source = id == 0 ? mEglCameraSource0 : mEglCameraSource1;
    return source != nullptr ? source->getImageData() : nullptr;
}

int OpenGLManager::takeSnapshot(OnFrameListener& listener, bool screenshot) {
    EglLog(VF_LOG_DEBUG, screenshot ? "EGL: Taking a screenshot of the rendered effect"
                                    : "EGL: Taking a snapshot of the rendered effect");
    VFTraceSection trace(screenshot ? "KI-SCREENSHOT" : "KI-SNAPSHOT");
    sp<EglSnapShotLite>& slot = screenshot ? mScreenShotLite : mSnapShotLite;
    releaseAndClear(slot);
    int width, height;
    {
        Mutex::Autolock lock(mLock);
        width = mPreviewWidth;
        height = mPreviewHeight;
    }
    sp<ImageConverter> converter = mConverter.get();
    slot = new EglSnapShotLite(mEglEnv, width, height, converter);
    int status;
    {
        VFTraceSection init(screenshot ? "KI-SCREENSHOT_INIT" : "KI-SNAPSHOT_INIT");
        status = slot->initialize();
    }
    if (status != 0) {
        EglLog(VF_LOG_ERROR, "EGL: Could not create snapshot FBO: %d", status);
        releaseAndClear(slot);
        status = VC_REPORT(VC_ERROR_UNKNOWN);
        listener.onProcessingError(status, "Could not create snapshot FBO");
        return status;
    }
    // A snapshot reads as the effect's own output (camera row 0 first); a
    // screenshot as the screen shows it (top row first).
    const EglProgram::GeometryType previewType = mProgram->getCameraGeometryType(0);
    if (screenshot) mProgram->setCameraGeometryType(EglProgram::GEOMETRY_NORMAL, 0);
    const nsecs_t timestamp = EglClock::get().bootTime();
    status = slot->takePictureSync(mProgram, listener, timestamp);
    if (status != 0) status = slot->takePictureReadPixels(mProgram, listener, timestamp);
    if (screenshot) mProgram->setCameraGeometryType(previewType, 0);
    if (status != 0) {
        EglLog(VF_LOG_ERROR, "EGL: Asynchronous picture failed: %d", status);
        listener.onProcessingError(status, "Asynchronous picture failed");
    }
    return status;
}

int OpenGLManager::setupPictureEnv(VCImage* base, VCImage* pip) {
    EGL_GL_CLEAR_ERRORS();
    const int cameras = mCameraLayout / 10;
    const bool dual = cameras == 2;
    if (!((dual && base != nullptr && pip != nullptr) || (cameras == 1 && base != nullptr))) {
        EglLog(VF_LOG_ERROR,
               "Incompatible input: dual camera is %s, basePicture = %p, pipPicture = %p",
               dual ? "true" : "false", (void*)base, (void*)pip);
        return VC_REPORT(VC_ERROR_INVALID_PARAM);
    }
    releaseAndClear(mSnapShot);
    const VCImage* sized = dual && base->data == nullptr && pip->data != nullptr ? pip : base;
    sp<ImageConverter> converter = mConverter.get();
    mSnapShot = new EglSnapShot(mEglEnv, sized->width, sized->height, converter);
    int status = mSnapShot->initialize();
    if (status != 0) {
        EglLog(VF_LOG_ERROR, "Failed to create a picture grabber for the image %dx%d '%4.4s'",
               sized->width, sized->height, (const char*)&sized->format);
        releaseAndClear(mSnapShot);
        return status == -12 ? VC_ERROR_ALLOC_FAILED : status;
    }
    int width, height;
    {
        Mutex::Autolock lock(mLock);
        width = mPreviewWidth;
        height = mPreviewHeight;
    }
    if (base->data == nullptr) {
        EglLog(VF_LOG_DEBUG,
               "The first picture has no data. Using preview dimensions and data: %dx%d", width,
               height);
    }
    if (!dual) {
        setupPictureGeometry(base->width, base->height, 0, 0);
    } else {
        if (pip->data == nullptr) {
            EglLog(VF_LOG_DEBUG,
                   "The second picture has no data. Using preview dimensions and data: %dx%d",
                   width, height);
        }
        setupPictureGeometry(base->width, base->height, pip->width, pip->height);
    }
    EglLog(VF_LOG_DEBUG, "Picture program was successfully loaded!");
    return 0;
}

void OpenGLManager::setupPictureGeometry(int width0, int height0, int width1, int height1) {
    // Pictures come top row first like the camera's frames, and leave the
    // same way: the picture's rows are not turned.
    mProgram->setCameraGeometryType(EglProgram::GEOMETRY_NORMAL, 0);
    if (mCameraLayout == CAMERA_LAYOUT_DUAL) {
        mProgram->setCameraGeometryType(EglProgram::GEOMETRY_NORMAL, 1);
    }
    mProgram->setCameraGeometry(width0, height0, width1, height1);
    mProgram->setPreviewGeometry(width0, height0, false);
}

int OpenGLManager::initializeStillImageDualAsync() {
    EglLog(VF_LOG_DEBUG, "EGL: initializeStillImageDualAsync()");
    if (mEglEnv == nullptr || eglGetCurrentContext() == EGL_NO_CONTEXT) {
        EglLog(VF_LOG_ERROR, "EGL: Display is invalid (EGL_NO_DISPLAY)");
        return VC_REPORT(VC_ERROR_UNKNOWN);
    }
    const int mode = mDualShotMode;
    Mutex::Autolock pictures(mPictureLock);
    if (mBasePicture == nullptr) return VC_REPORT(VC_ERROR_UNKNOWN);
    mStillImage = new EglImage(mEglEnv, EglImage::IMAGE_EXTERNAL, mPreviewSurface->getWidth(),
                               mPreviewSurface->getHeight(), VC_FORMAT_NV21);
    int status = mStillImage->initialize();
    if (status == 0 && mode == DUAL_SHOT_STILL_CAMERA1) {
        VCImage* picture = nullptr;
        if (mPipPicture != nullptr && mPipPicture->data != nullptr) {
            status = mStillImage->setImageData(*mPipPicture, GL_CLAMP_TO_EDGE);
        } else {
            {
                Mutex::Autolock state(mStateLock);
                VCImage_destroy(mPipPicture);
                mPipPicture = nullptr;
            }
            if (mCameraLayout == CAMERA_LAYOUT_DUAL && mEglCameraSource1 != nullptr) {
                EglLog(VF_LOG_DEBUG, "Using preview data for the 2nd camera");
                picture = mEglCameraSource1->getImageData();
                if (picture == nullptr) {
                    EglLog(VF_LOG_WARNING,
                           "Failed to get the current buffer from mEglCameraSource1");
                }
            }
            status = picture != nullptr ? mStillImage->setImageData(*picture, GL_CLAMP_TO_EDGE)
                                        : VC_ERROR_UNKNOWN;
            VCImage_destroy(picture);
        }
    } else if (status == 0) {
        status = mBasePicture->data != nullptr
                     ? mStillImage->setImageData(*mBasePicture, GL_CLAMP_TO_EDGE)
                     : VC_ERROR_UNKNOWN;
    }
    if (status != 0) {
        releaseAndClear(mStillImage);
        return VC_REPORT(VC_ERROR_UNKNOWN);
    }
    EglLog(VF_LOG_DEBUG, "EGL: Successfully created still image!");
    return 0;
}
