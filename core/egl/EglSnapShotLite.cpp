#include "core/egl/EglSnapShotLite.h"

#include <GLES2/gl2.h>

#include "core/egl/EglCheck.h"
#include "vccore/vc_log.h"

#define VC_SOURCE "core/egl/EglSnapShotLite"

using android::sp;

namespace {

const EglSnapShotNames kNames = {"KI-SNAPSHOT_GETIMAGE", "KI-SNAPSHOT_CONVERT",
                                 "KI-SNAPSHOT_CONVERTANDPOST"};

}  // namespace

EglSnapShotLite::EglSnapShotLite(const sp<EglEnvironment>& env, int width, int height,
                                 sp<ImageConverter>& converter)
    : EglObject(width, height),
      mEglEnv(env),
      mWorkQueue(1, false),
      mConverter(converter),
      mBuffers(std::make_shared<EglSnapShotBuffers>()) {}

EglSnapShotLite::~EglSnapShotLite() {
    mWorkQueue.finish();
}

int EglSnapShotLite::initialize_l() {
    mBuffers->open();
    return EglSnapShot_makeTarget(mEglEnv, mWidth, mHeight, mTarget);
}

void EglSnapShotLite::release_l() {
    EglSnapShot_drainQueue(mWorkQueue);
    mBuffers->close();
    if (mTarget != nullptr) mTarget->release();
    mTarget.clear();
}

int EglSnapShotLite::eglFlush() {
    return GL_CHECK(glFinish()) ? 0 : VC_REPORT(VC_ERROR_UNKNOWN);
}

// Steps shared by both capture paths: bind, draw, unbind, and the program's
// geometry for the target and then back for the screen. The synchronous path
// waits for the GPU here; the asynchronous one only submits the work, and its
// fence does the waiting on the work queue's thread.
int EglSnapShotLite::draw(sp<EglProgram>& program, bool finish) {
    if (mTarget == nullptr) return VC_REPORT(VC_ERROR_INVALID_STATE);
    if (program == nullptr) return VC_REPORT(VC_ERROR_NULL_PARAM);
    // A previous capture's job may still be reading the target: the buffer
    // takes one lock at a time, and its pixels are about to change.
    EglSnapShot_drainQueue(mWorkQueue);
    // Bound first, so that a target that cannot be bound leaves the program as it was.
    int status = mTarget->bindFrameBuffer();
    if (status != 0) {
        EglLog(VF_LOG_ERROR, "EGL: Can not bind FBO. Failed to take a picture.");
        return status;
    }
    program->setCameraGeometry(mWidth, mHeight, 0, 0);
    program->setPreviewGeometry(mWidth, mHeight, false);
    {
        VFTraceSection trace("KI-SNAPSHOT_DRAW");
        mTarget->flushCache();
        // The flush leaves the default framebuffer bound: the draw must go
        // to the target.
        status = mTarget->bindFrameBuffer();
        if (status == 0) status = program->onDrawFrame();
        if (status == 0 && finish) status = eglFlush();
    }
    mTarget->unbindFrameBuffer();
    program->setCameraGeometry(mWidth, mHeight, 0, 0);
    program->setPreviewGeometry(mWidth, mHeight, true);
    return status;
}

int EglSnapShotLite::takePictureSync(sp<EglProgram>& program, OnFrameListener& listener,
                                     nsecs_t timestamp) {
    int status = draw(program, true);
    if (status != 0) return status;
    EglLog(VF_LOG_DEBUG, "EGL: Synchronously waiting for rendering...");
    if (!GL_CHECK(glFinish())) return VC_REPORT(VC_ERROR_UNKNOWN);
    status = readAndPost(listener, timestamp);
    if (status != 0)
        EglLog(VF_LOG_ERROR, "EGL: EglSnapShotLite::takePicture failed [sync] in readAndPost(): %d",
               status);
    return status;
}

int EglSnapShotLite::takePictureAsync(sp<EglProgram>& program, OnFrameListener& listener,
                                      nsecs_t timestamp, EGLTimeKHR timeout) {
    int status = draw(program, false);
    if (status != 0) return status;
    const EGLDisplay display = mEglEnv->getEGLDisplay();
    EGLSyncKHR sync = EglSnapShot_createFence(display, VC_SOURCE);
    if (sync == EGL_NO_SYNC_KHR) {
        // No fence: the synchronous tail, here on the render thread.
        if (!GL_CHECK(glFinish())) return VC_REPORT(VC_ERROR_UNKNOWN);
        status = readAndPost(listener, timestamp);
        if (status != 0)
            EglLog(VF_LOG_ERROR,
                   "EGL: EglSnapShotLite::takePicture failed [sync] in readAndPost(): %d", status);
        return status;
    }
    EglSnapShotWaitJob* job = new EglSnapShotWaitJob(*this, listener, timestamp, display, sync,
                                                     static_cast<uint64_t>(timeout));
    status = mWorkQueue.schedule(job, 2);
    if (status != 0) {
        EglLog(VF_LOG_ERROR, "EGL: Work queue failed [%s]: %d",
               "int EglSnapShotLite::takePictureAsync(android::sp<EglProgram>&, OnFrameListener&, "
               "nsecs_t, EGLTimeKHR)",
               status);
        delete job;
        return status;
    }
    EglLog(VF_LOG_DEBUG, "EGL: Asynchronous snapshot fence waiting job created.");
    return 0;
}

int EglSnapShotLite::takePictureReadPixels(sp<EglProgram>& program, OnFrameListener& listener,
                                           nsecs_t timestamp) {
    if (program == nullptr) return VC_REPORT(VC_ERROR_NULL_PARAM);
    VCImage* snapshot = EglSnapShotBuffers::newImage(mBuffers, mWidth, mHeight);
    if (snapshot == nullptr) {
        EglLog(VF_LOG_ERROR, "image allocation failed");
        return VC_REPORT(VC_ERROR_UNKNOWN);
    }
    program->setCameraGeometry(mWidth, mHeight, 0, 0);
    program->setPreviewGeometry(mWidth, mHeight, false);
    int status = program->onDrawFrame();
    program->setCameraGeometry(mWidth, mHeight, 0, 0);
    program->setPreviewGeometry(mWidth, mHeight, true);
    if (status == 0 && !GL_CHECK(glReadPixels(0, 0, snapshot->width, snapshot->height, GL_RGBA,
                                              GL_UNSIGNED_BYTE, snapshot->data)))
        status = VC_REPORT(VC_ERROR_UNKNOWN);
    if (status != 0) {
        VCImage_destroy(snapshot);
        return status;
    }
    if (mConverter->convertAndPost(snapshot, listener, timestamp, true) != 0) {
        EglLog(VF_LOG_ERROR, "EGL: Image conversion failed");
        return VC_REPORT(VC_ERROR_UNKNOWN);
    }
    return 0;
}

int EglSnapShotLite::readAndPost(OnFrameListener& listener, nsecs_t timestamp) {
    if (mTarget == nullptr) return VC_REPORT(VC_ERROR_INVALID_STATE);
    const int status = EglSnapShot_readAndPost(*mTarget, *mConverter, mBuffers, mWidth, mHeight,
                                               listener, timestamp, kNames);
    return status == kEglSnapShotReportUnknown ? VC_REPORT(VC_ERROR_UNKNOWN) : status;
}
