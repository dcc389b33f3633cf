#include "kivimaging/OpenGLManager.h"

#include <math.h>

#include <EGL/egl.h>
#include <GLES2/gl2.h>
#include <android/native_window.h>
#include <system/window.h>

#include "core/KivImaging.h"
#include "core/egl/AsyncImageConverter.h"
#include "core/egl/EglCheck.h"
#include "core/egl/EglEnvironment.h"
#include "core/egl/EglImage.h"
#include "core/egl/EglProgram.h"
#include "core/egl/EglSnapShot.h"
#include "core/egl/EglSnapShotLite.h"
#include "core/egl/EglWindow.h"
#include "core/egl/EglWindowSurface.h"
#include "core/egl/OpenGLManagerThread.h"
#include "vccore/vc_error.h"
#include "vccore/vc_image.h"
#include "vccore/vc_log.h"

#define VC_SOURCE "core/egl/OpenGLManager"

using android::Mutex;
using android::sp;

namespace {

// The largest intermediate image: taller previews are scaled down to it.
const int kMaxIntermediateHeight = 1080;

}  // namespace

OpenGLManager::OpenGLManager(OpenGLManagerMode mode, DisplayDeviceMode display)
    : mMode(mode),
      mDisplayDeviceMode(display),
      mCameraLayout(CAMERA_LAYOUT_SINGLE),
      mRecording(false),
      mPreviewStopped(false),
      mPictureListener(nullptr),
      mBasePicture(nullptr),
      mPipPicture(nullptr),
      mCaptureRequest(CAPTURE_NONE),
      mSaveAsFlipped(false),
      mConverter(new AsyncImageConverter(1)),
      mCameraWidth0(0),
      mCameraHeight0(0),
      mCameraWidth1(0),
      mCameraHeight1(0),
      mPreviewWidth(0),
      mPreviewHeight(0),
      mRecordingWidth(0),
      mRecordingHeight(0),
      mDualShotMode(DUAL_SHOT_NONE),
      mRecordingInterval(-1),
      mRecordingMotion(0),
      mFilter(nullptr) {}

OpenGLManager::~OpenGLManager() {
    EglLog(VF_LOG_DEBUG, "Destroying OpenGLManager...");
    release();
}

// Client side ----------------------------------------------------------------

void OpenGLManager::startRenderThread() {
    Mutex::Autolock state(mStateLock);
    if (mRenderThread != nullptr) {
        EglLog(VF_LOG_ERROR, "EGL Error: Render thread is running!! %s:%d",
               "void OpenGLManager::startRenderThread()", __LINE__);
        return;
    }
    mWindowReady.clear();
    // A manager started again after release() needs a converter again.
    if (mConverter == nullptr) mConverter = new AsyncImageConverter(1);
    mPreviewStopped = false;
    sp<RenderThread> thread = new RenderThread(this);
    sp<ANWCondition> condition = new ANWCondition();
    mWindowReady = condition;
    thread->setANWAvailableListener(condition);
    mRenderThread = thread;
    // Named: the platform's thread class refuses a thread without a name.
    thread->run("KivRenderThread");
}

android::sp<ANativeWindow> OpenGLManager::getNewPreviewWindowForOpenGL(int id) {
    static const char* const kFunction = "getNewPreviewWindowForOpenGL";
    if (id != 0 && id != 1) {
        EglLog(VF_LOG_ERROR, "%s: invalid id %d", kFunction, id);
        return nullptr;
    }
    sp<ANWCondition> condition;
    {
        Mutex::Autolock state(mStateLock);
        condition = mWindowReady;
    }
    if (condition == nullptr) {
        EglLog(VF_LOG_ERROR, "%s: the render thread is not running", kFunction);
        return nullptr;
    }
    condition->waitAvailable();
    sp<ANativeWindow> window;
    {
        Mutex::Autolock lock(mLock);
        const sp<EglWindow>& source = id == 0 ? mEglCameraSource0 : mEglCameraSource1;
        if (source != nullptr) window = source->getANativeWindow();
    }
    EglLog(VF_LOG_DEBUG,
           id == 0 ? "In %s, mPreviewANativeWindow = %p" : "In %s, mPreviewANativeWindow2 = %p",
           kFunction, window.get());
    return window;
}

void OpenGLManager::notifyGLSurfaceConnectionComplete() {
    sp<ANWCondition> condition;
    {
        Mutex::Autolock state(mStateLock);
        condition = mWindowReady;
    }
    if (condition != nullptr) condition->setConnected();
}

void OpenGLManager::release() {
    EglLog(VF_LOG_DEBUG, "OpenGLManager::release");
    sp<RenderThread> thread;
    {
        Mutex::Autolock state(mStateLock);
        thread = mRenderThread;
    }
    if (thread != nullptr) {
        thread->destroyAndWait();
        thread->requestExitAndWait();
        Mutex::Autolock state(mStateLock);
        mRenderThread.clear();
    }
    releaseCommon();
}

void OpenGLManager::releaseCommon() {
    EglLog(VF_LOG_DEBUG, "OpenGLManager::releaseCommon");
    sp<AsyncImageConverter> converter;
    {
        Mutex::Autolock lock(mLock);
        // Dropped outside the lock: the last reference waits for the frames
        // still being delivered.
        converter = mConverter;
        mConverter.clear();
        mFilter = nullptr;
        mPreviewWindow.clear();
    }
    Mutex::Autolock pictures(mPictureLock);
    Mutex::Autolock state(mStateLock);
    mWindowReady.clear();
    VCImage_destroy(mBasePicture);
    VCImage_destroy(mPipPicture);
    mBasePicture = nullptr;
    mPipPicture = nullptr;
}

void OpenGLManager::setCameraSize(int width0, int height0, int width1, int height1) {
    Mutex::Autolock lock(mLock);
    mCameraWidth0 = width0;
    mCameraHeight0 = height0;
    mCameraWidth1 = width1;
    mCameraHeight1 = height1;
    if (mProgram != nullptr) mProgram->setCameraGeometry(width0, height0, width1, height1);
}

void OpenGLManager::setPreviewSize(int width, int height) {
    Mutex::Autolock lock(mLock);
    mPreviewWidth = width;
    mPreviewHeight = height;
    if (mProgram != nullptr) mProgram->setPreviewGeometry(width, height, true);
}

void OpenGLManager::setPreviewWindow(const sp<ANativeWindow>& window, int layout) {
    Mutex::Autolock lock(mLock);
    if (layout != CAMERA_LAYOUT_SINGLE && layout != CAMERA_LAYOUT_SINGLE_MIRRORED &&
        layout != CAMERA_LAYOUT_DUAL) {
        EglLog(VF_LOG_WARNING, "EGL: unknown camera layout %d, drawn as one camera", layout);
    }
    mCameraLayout = layout;
    if (window != nullptr) {
        mPreviewWindow = window;
        mPreviewWidth = ANativeWindow_getWidth(window.get());
        mPreviewHeight = ANativeWindow_getHeight(window.get());
        if (mProgram != nullptr) mProgram->setPreviewGeometry(mPreviewWidth, mPreviewHeight, true);
        EglLog(VF_LOG_DEBUG, "EGL: KivCamera native window geometry %dx%d [%p]", mPreviewWidth,
               mPreviewHeight, window.get());
    } else {
        EglLog(VF_LOG_WARNING, "EGL: called OpenGLManager::setPreviewWindow with NULL window");
        mPreviewWindow.clear();
        mPreviewWidth = 0;
        mPreviewHeight = 0;
        // The surface itself is EGL state of the render thread, which stops
        // at its next swap (no window) and releases it there.
    }
}

void OpenGLManager::setFilter(const KivImaging* imaging) {
    sp<EglProgram> program;
    {
        Mutex::Autolock lock(mLock);
        program = mProgram;
    }
    if (program != nullptr) program->setFilter(nullptr);
    KivFilter* filter = imaging != nullptr ? imaging->getFilter() : nullptr;
    mFilter = filter;
    EglLog(VF_LOG_DEBUG, "EGL: setFilter: %p [%p]", (void*)filter, (const void*)imaging);
    if (program != nullptr) program->setFilter(filter);
}

void OpenGLManager::setSaveAsFlipped(bool flipped) {
    EglLog(VF_LOG_ERROR, "OpenGLManager::setSaveAsFlipped: %s", flipped ? "true" : "false");
    mSaveAsFlipped = flipped;
}

void OpenGLManager::setOnPictureListener(OnFrameListener* listener) {
    mPictureListener = listener;
}

void OpenGLManager::setDualShotAsyncCapture(int mode) {
    Mutex::Autolock state(mStateLock);
    if (mRenderThread != nullptr) mDualShotMode = mode;
}

void OpenGLManager::onTakePicture(CaptureMode mode) {
    mCaptureRequest = mode;
}

void OpenGLManager::requestRender() {
    sp<RenderThread> thread;
    {
        Mutex::Autolock state(mStateLock);
        thread = mRenderThread;
    }
    if (thread != nullptr) thread->requestRender();
}

void OpenGLManager::stopPreview() {
    mPreviewStopped = true;
    previewRequestRender();
}

// The windows are used under the lock rather than copied out of it, so that
// they always die on the render thread, which releases them.
void OpenGLManager::previewRequestRender() {
    Mutex::Autolock lock(mLock);
    if (mEglCameraSource0 != nullptr) mEglCameraSource0->requestRender();
    if (mEglCameraSource1 != nullptr) mEglCameraSource1->requestRender();
}

void OpenGLManager::flushCameraSource() {
    Mutex::Autolock lock(mLock);
    if (mEglCameraSource0 != nullptr) mEglCameraSource0->flushTexImage();
    if (mEglCameraSource1 != nullptr) mEglCameraSource1->flushTexImage();
}

bool OpenGLManager::isRenderThreadRunning() {
    Mutex::Autolock state(mStateLock);
    return mRenderThread != nullptr && !mRenderThread->isStopRequested();
}

// Render thread --------------------------------------------------------------

int OpenGLManager::initializeEGLEnv() {
    EGL_GL_CLEAR_ERRORS();
    mEglEnv = new EglEnvironment();
    if (mEglEnv->initialize() != 0) return VC_REPORT(VC_ERROR_UNKNOWN);
    sp<ANativeWindow> window;
    {
        Mutex::Autolock lock(mLock);
        window = mPreviewWindow;
    }
    // Without a window the context still needs a surface to create the
    // camera windows on; every swap is then refused.
    if (window != nullptr) {
        mPreviewSurface = new EglWindowSurface(mEglEnv, window,
                                               mDisplayDeviceMode == DISPLAY_DEVICE_SOFTWARE
                                                   ? EglWindowSurface::SURFACE_PREVIEW_SW
                                                   : EglWindowSurface::SURFACE_PREVIEW);
    } else {
        mPreviewSurface = new EglWindowSurface(mEglEnv);
    }
    int status = mPreviewSurface->initialize();
    if (status != 0) return status;
    return mPreviewSurface->bindSurface();
}

int OpenGLManager::setCameraSource(int id) {
    const int layout = mCameraLayout;
    if (layout == CAMERA_LAYOUT_DUAL && id != 0 && id != 1) {
        EglLog(VF_LOG_ERROR, "%s: invalid id or state: id = %d", "setCameraSource", id);
        return VC_REPORT(VC_ERROR_INVALID_PARAM);
    }
    const bool second = id == 1 && layout == CAMERA_LAYOUT_DUAL;
    sp<EglWindow> window;
    {
        Mutex::Autolock lock(mLock);
        window = second ? new EglWindow(1, mCameraWidth1, mCameraHeight1)
                        : new EglWindow(0, mCameraWidth0, mCameraHeight0);
    }
    const int status = window->initialize();
    sp<EglWindow> old;
    {
        Mutex::Autolock lock(mLock);
        sp<EglWindow>& slot = second ? mEglCameraSource1 : mEglCameraSource0;
        old = slot;
        slot = window;
    }
    if (old != nullptr) old->release();
    return status;
}

int OpenGLManager::initializeGL() {
    // A frame whose make-current failed comes back here: build once.
    if (mProgram != nullptr) return 0;
    sp<EglProgram> program = new EglProgram();
    {
        Mutex::Autolock lock(mLock);
        mProgram = program;
    }
    setupPreviewGeometry(false);
    program->setFilter(mFilter.load());
    if (program->initialize(mCameraLayout, false) != 0) {
        EglLog(VF_LOG_ERROR, "EGL: Program could not be loaded.");
        return VC_REPORT(VC_ERROR_UNKNOWN);
    }
    if (mMode != OPENGL_MANAGER_INTERMEDIATE) return 0;

    if (!initializeRecordingFBO()) {
        EglLog(VF_LOG_ERROR, "EGL: Failed to create intermediate FBO.");
        return VC_REPORT(VC_ERROR_UNKNOWN);
    }
    sp<EglProgram> copy = new EglProgram();
    {
        Mutex::Autolock lock(mLock);
        mCopyProgram = copy;
    }
    copy->setCameraGeometryType(mCameraLayout == CAMERA_LAYOUT_SINGLE_MIRRORED
                                    ? EglProgram::GEOMETRY_ROTATE_180
                                    : EglProgram::GEOMETRY_VFLIP,
                                0);
    int width, height;
    {
        Mutex::Autolock lock(mLock);
        width = mPreviewWidth;
        height = mPreviewHeight;
    }
    copy->setCameraGeometry(width, height, 0, 0);
    copy->setPreviewGeometry(width, height, true);
    if (copy->initialize(CAMERA_LAYOUT_SINGLE, true) != 0) {
        EglLog(VF_LOG_ERROR, "EGL: Copy program could not be loaded.");
        return VC_REPORT(VC_ERROR_UNKNOWN);
    }
    return 0;
}

int OpenGLManager::updateCameraSource(int id, bool first) {
    const int layout = mCameraLayout;
    if (layout == CAMERA_LAYOUT_DUAL && id != 0 && id != 1) {
        EglLog(VF_LOG_ERROR, "%s: invalid id or state: id = %d", "updateCameraSource", id);
        return VC_REPORT(VC_ERROR_INVALID_PARAM);
    }
    const sp<EglWindow>& source =
        id == 1 && layout == CAMERA_LAYOUT_DUAL ? mEglCameraSource1 : mEglCameraSource0;
    if (source == nullptr) return VC_REPORT(VC_ERROR_INVALID_STATE);
    if (mPreviewStopped) return source->updateTexImage(1LL);
    if (first) return source->updateTexImage(0LL);
    return source->updateTexImage();
}

void OpenGLManager::setupPreviewGeometry(bool recording) {
    const sp<EglProgram>& program = mProgram;
    if (program == nullptr) return;
    const int layout = mCameraLayout;
    if (layout == CAMERA_LAYOUT_DUAL) {
        program->setCameraGeometryType(EglProgram::GEOMETRY_VFLIP, 0);
        program->setCameraGeometryType(EglProgram::GEOMETRY_ROTATE_180, 1);
    } else {
        program->setCameraGeometryType(layout == CAMERA_LAYOUT_SINGLE_MIRRORED
                                           ? EglProgram::GEOMETRY_ROTATE_180
                                           : EglProgram::GEOMETRY_VFLIP,
                                       0);
    }
    Mutex::Autolock lock(mLock);
    if (recording) {
        program->setCameraGeometry(mRecordingWidth, mRecordingHeight, 0, 0);
        program->setPreviewGeometry(mRecordingWidth, mRecordingHeight, true);
        return;
    }
    mPreviewWidth = mPreviewSurface->getWidth();
    mPreviewHeight = mPreviewSurface->getHeight();
    EglLog(VF_LOG_DEBUG, "EGL: Updated window geometry to %dx%d [%p]", mPreviewWidth,
           mPreviewHeight, mPreviewWindow.get());
    // A camera whose size the client did not give has its window's.
    int width0 = mCameraWidth0, height0 = mCameraHeight0;
    if ((width0 <= 0 || height0 <= 0) && mEglCameraSource0 != nullptr) {
        width0 = mEglCameraSource0->getWidth();
        height0 = mEglCameraSource0->getHeight();
    }
    program->setCameraGeometry(width0, height0, mCameraWidth1, mCameraHeight1);
    program->setPreviewGeometry(mPreviewWidth, mPreviewHeight, true);
}

int OpenGLManager::onDrawFrame() {
    VFTraceSection trace("KI-onDrawFrame");
    bool recording;
    {
        Mutex::Autolock lock(mLock);
        recording = mRecording;
    }
    if (mProgram == nullptr) return 0;
    if (mMode != OPENGL_MANAGER_INTERMEDIATE || !recording || mIntermediateImage == nullptr) {
        return mProgram->onDrawFrame();
    }
    // One effect pass into the intermediate image, copied to the screen here
    // and to the recorder later in the frame.
    if (mIntermediateImage->bindFrameBuffer() != 0) {
        GL_CHECK(glBindFramebuffer(GL_FRAMEBUFFER, 0));
        return mProgram->onDrawFrame();
    }
    const int previewWidth = mProgram->getPreviewWidth();
    const int previewHeight = mProgram->getPreviewHeight();
    const bool flip = mProgram->getPreviewFlip();
    mProgram->setPreviewGeometry(mIntermediateImage->getWidth(), mIntermediateImage->getHeight(),
                                 flip);
    const int status = mProgram->onDrawFrame();
    mProgram->setPreviewGeometry(previewWidth, previewHeight, flip);
    mIntermediateImage->unbindFrameBuffer();
    onDrawFrameMirroring(false);
    return status;
}

int OpenGLManager::onDrawFrameMirroring(bool recording) {
    if (mIntermediateImage == nullptr || mCopyProgram == nullptr) {
        return VC_REPORT(VC_ERROR_INVALID_STATE);
    }
    GL_CHECK(glActiveTexture(GL_TEXTURE0));
    mIntermediateImage->bindTexture();
    int width, height;
    EglProgram::GeometryType type = EglProgram::GEOMETRY_NORMAL;
    {
        Mutex::Autolock lock(mLock);
        width = recording ? mRecordingWidth : mPreviewWidth;
        height = recording ? mRecordingHeight : mPreviewHeight;
    }
    if (recording && mCameraLayout == CAMERA_LAYOUT_SINGLE_MIRRORED) {
        type = mSaveAsFlipped ? EglProgram::GEOMETRY_NORMAL : EglProgram::GEOMETRY_HFLIP;
    }
    mCopyProgram->setCameraGeometry(width, height, 0, 0);
    mCopyProgram->setPreviewGeometry(width, height, true);
    mCopyProgram->setCameraGeometryType(type, 0);
    return mCopyProgram->onDrawFrame();
}

bool OpenGLManager::initializeRecordingFBO() {
    int width, height;
    {
        Mutex::Autolock lock(mLock);
        width = mPreviewWidth;
        height = mPreviewHeight;
    }
    if (height > kMaxIntermediateHeight) {
        width = (int)ceilf((float)width * (float)kMaxIntermediateHeight / (float)height);
        height = kMaxIntermediateHeight;
    }
    EglLog(VF_LOG_DEBUG, "%s : %d x %d", "bool OpenGLManager::initializeRecordingFBO()", width,
           height);
    releaseAndClear(mIntermediateImage);
    mIntermediateImage = new EglImage(mEglEnv, EglImage::IMAGE_FRAMEBUFFER, width, height);
    if (mIntermediateImage->initialize() != 0) {
        releaseAndClear(mIntermediateImage);
        return false;
    }
    return true;
}

bool OpenGLManager::isRecording() {
    return mRecording.load();
}

void OpenGLManager::releaseFromGL() {
    Mutex::Autolock lock(mLock);
    EglLog(VF_LOG_DEBUG, "OpenGLManager::releaseFromGL");
    // Start-up may have failed before a context was current: no GL then.
    const bool current = eglGetCurrentContext() != EGL_NO_CONTEXT;
    if (current) GL_CHECK(glBindFramebuffer(GL_FRAMEBUFFER, 0));
    releaseAndClear(mIntermediateImage);
    releaseAndClear(mStillImage);
    releaseAndClear(mSnapShot);
    releaseAndClear(mSnapShotLite);
    releaseAndClear(mScreenShotLite);
    if (mProgram != nullptr) {
        mProgram->setFilter(nullptr);
        // The effect's GL objects went to the program's recycler.
        if (current) mProgram->getRecycler()->recycle();
    }
    releaseAndClear(mProgram);
    releaseAndClear(mCopyProgram);
    releaseAndClear(mRecordingSurface);
    releaseAndClear(mRecordingWindow);
    releaseAndClear(mEglCameraSource0);
    releaseAndClear(mEglCameraSource1);
    if (current) GL_CHECK(glReleaseShaderCompiler());
    EGL_GL_CLEAR_ERRORS();
    if (mPreviewSurface != nullptr) mPreviewSurface->unbindSurface();
    releaseAndClear(mPreviewSurface);
    if (mEglEnv != nullptr) mEglEnv->release();
    mEglEnv.clear();
}
