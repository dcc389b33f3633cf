// A full-resolution picture: the client's camera picture (or the pictures of
// two cameras) uploaded into buffer-backed external textures and drawn through
// the current program into a picture-sized buffer-backed framebuffer, read
// back, converted to the listener's format and posted; synchronously on the
// render thread, or behind a fence on the snapshot's own one-thread queue.
// Pictures larger than the GPU's largest texture are cropped around their
// centre. Captures are serialised: a capture waits (bounded) until the
// previous one has given back the images.
#ifndef CORE_EGL_EGLSNAPSHOT_H
#define CORE_EGL_EGLSNAPSHOT_H

#include <EGL/egl.h>
#include <EGL/eglext.h>
#include <utils/Condition.h>
#include <utils/Mutex.h>
#include <utils/StrongPointer.h>
#include <utils/Timers.h>

#include "core/egl/EglEnvironment.h"
#include "core/egl/EglImage.h"
#include "core/egl/EglObject.h"
#include "core/egl/EglProgram.h"
#include "core/egl/EglSnapShotCommon.h"
#include "core/egl/ImageConverter.h"
#include "core/egl/WorkQueue.h"

class EglSnapShot : public EglObject {
public:
    typedef ::EglSnapShotWaitJob<EglSnapShot> EglSnapShotWaitJob;

    // Render thread, context current (the 8K mode and the fitting read GL).
    EglSnapShot(const android::sp<EglEnvironment>& env, int width, int height,
                android::sp<ImageConverter>& converter);
    // Lets pending captures post first.
    virtual ~EglSnapShot();

    // Render thread. pip is the second camera's picture, needed when the
    // program draws two cameras. 0, -2 for a missing picture, or the failing
    // step's status.
    int takePictureSync(const VCImage* base, const VCImage* pip,
                        const android::sp<EglProgram>& program, OnFrameListener& listener,
                        nsecs_t timestamp);
    int takePictureAsync(const VCImage* base, const VCImage* pip,
                         const android::sp<EglProgram>& program, OnFrameListener& listener,
                         nsecs_t timestamp, EGLTimeKHR timeout);
    // Wait job or sync path; gives the images back on every path.
    int readAndPost(OnFrameListener& listener, nsecs_t timestamp);
    // A capture whose fence wait failed: gives the images back.
    void abandonCapture();

    void fixSupportedSize(int w, int h, int& outW, int& outH);
    // A new image the caller destroys: the picture itself (wrapped, no copy)
    // when it fits the fitted size, else its centre cropped to that size.
    VCImage* cropImageSupportedSize(const VCImage* image);
    void setTexture8K(bool on);
    int eglFlush();

    // How long a capture waits for the previous one to give back the images.
    void setPreviousCaptureTimeout(nsecs_t timeout) { mPreviousCaptureTimeout = timeout; }

protected:
    int initialize_l() override;
    // Waits for pending captures, then releases the target and the inputs.
    void release_l() override;

private:
    int beginCapture(const VCImage* base, const VCImage* pip,
                     const android::sp<EglProgram>& program, const char* function);
    int prepare(const VCImage* base, const VCImage* pip, const android::sp<EglProgram>& program,
                bool finish);
    int upload(android::sp<EglImage>& slot, const VCImage* picture, int unit, const char* initLabel,
               const char* setLabel);
    void giveBackImages();
    int syncTail(OnFrameListener& listener, nsecs_t timestamp, bool dual);

    android::sp<EglEnvironment> mEglEnv;
    android::sp<EglImage> mTarget;
    android::sp<ImageConverter> mConverter;
    std::shared_ptr<EglSnapShotBuffers> mBuffers;
    android::sp<EglImage> mInputs[2];
    android::WorkQueue mWorkQueue;
    android::Mutex mLock;
    android::Condition mCondition;
    bool mImagesBusy;
    nsecs_t mPreviousCaptureTimeout;
};

#endif
