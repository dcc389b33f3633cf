// A snapshot at preview size: the current program drawn once more, without a
// new input picture, into a buffer-backed framebuffer that is read back,
// converted to the listener's format and posted. Synchronously on the render
// thread, or asynchronously: a fence after the draw and a job on the
// snapshot's own one-thread queue that waits for it, reads back and posts.
#ifndef CORE_EGL_EGLSNAPSHOTLITE_H
#define CORE_EGL_EGLSNAPSHOTLITE_H

#include <EGL/egl.h>
#include <EGL/eglext.h>
#include <utils/StrongPointer.h>
#include <utils/Timers.h>

#include "core/egl/EglEnvironment.h"
#include "core/egl/EglImage.h"
#include "core/egl/EglObject.h"
#include "core/egl/EglProgram.h"
#include "core/egl/EglSnapShotCommon.h"
#include "core/egl/ImageConverter.h"
#include "core/egl/WorkQueue.h"

class EglSnapShotLite : public EglObject {
public:
    typedef ::EglSnapShotWaitJob<EglSnapShotLite> EglSnapShotWaitJob;

    // The target is made by initialize(), on the render thread.
    EglSnapShotLite(const android::sp<EglEnvironment>& env, int width, int height,
                    android::sp<ImageConverter>& converter);
    // Lets pending captures post first.
    virtual ~EglSnapShotLite();

    // Render thread, context current. 0, or the failing step's status.
    int takePictureSync(android::sp<EglProgram>& program, OnFrameListener& listener,
                        nsecs_t timestamp);
    int takePictureAsync(android::sp<EglProgram>& program, OnFrameListener& listener,
                         nsecs_t timestamp, EGLTimeKHR timeout);
    // Without a framebuffer object: draws into the current surface and reads
    // it with glReadPixels.
    int takePictureReadPixels(android::sp<EglProgram>& program, OnFrameListener& listener,
                              nsecs_t timestamp);
    // Wait job or sync path.
    virtual int readAndPost(OnFrameListener& listener, nsecs_t timestamp);
    // A capture whose fence wait failed: nothing to post.
    void abandonCapture() {}
    int eglFlush();

protected:
    int initialize_l() override;
    // Waits for pending captures, then releases the target.
    void release_l() override;

private:
    int draw(android::sp<EglProgram>& program, bool finish);

    android::sp<EglEnvironment> mEglEnv;
    android::sp<EglImage> mTarget;
    android::WorkQueue mWorkQueue;
    android::sp<ImageConverter> mConverter;
    std::shared_ptr<EglSnapShotBuffers> mBuffers;
};

#endif
