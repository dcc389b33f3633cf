#include "core/egl/EglSnapShotCommon.h"

#include <utils/Condition.h>
#include <utils/Mutex.h>

#include <stdlib.h>

#include <GLES2/gl2.h>

#include "core/egl/EglCheck.h"
#include "core/egl/EglExtensions.h"
#include "core/egl/EglImage.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_log.h"

namespace {

EGLSyncKHR createSync(EGLDisplay display, EGLenum type, const EGLint* attributes) {
    PFNEGLCREATESYNCKHRPROC create = EglExtensions::get().eglCreateSyncKHR;
    return create != nullptr ? create(display, type, attributes) : EGL_NO_SYNC_KHR;
}

EGLint clientWait(EGLDisplay display, EGLSyncKHR sync, EGLint flags, EGLTimeKHR timeout) {
    return EglExtensions::get().eglClientWaitSyncKHR(display, sync, flags, timeout);
}

const char* fourcc(const uint32_t& format) {
    return reinterpret_cast<const char*>(&format);
}

// Lets a draining caller go on once it has run, or been dropped unrun.
class DrainUnit : public android::WorkQueue::WorkUnit {
public:
    DrainUnit(android::Mutex& lock, android::Condition& done, bool& flag)
        : mLock(lock), mDone(done), mFlag(flag) {}
    ~DrainUnit() override {
        android::Mutex::Autolock guard(mLock);
        mFlag = true;
        mDone.broadcast();
    }
    bool run() override { return true; }

private:
    android::Mutex& mLock;
    android::Condition& mDone;
    bool& mFlag;
};

}  // namespace

// An image on a buffer of EglSnapShotBuffers: destroying it gives the buffer
// back, unless someone has since freed or replaced the buffer.
class EglSnapShotBuffers::Image : public VCImage {
public:
    Image(const std::shared_ptr<EglSnapShotBuffers>& buffers, unsigned char* buffer, int w, int h,
          uint32_t bytes)
        : mBuffers(buffers), mBuffer(buffer) {
        data = buffer;
        width = w;
        height = h;
        format = VC_FORMAT_RGBA;
        size = bytes;
    }
    ~Image() override {
        if (data == mBuffer && !wrapped && mBuffers->keep(data, size)) data = nullptr;
    }

private:
    std::shared_ptr<EglSnapShotBuffers> mBuffers;
    unsigned char* mBuffer;
};

EglSnapShotBuffers::~EglSnapShotBuffers() {
    free(mData);
}

VCImage* EglSnapShotBuffers::newImage(const std::shared_ptr<EglSnapShotBuffers>& buffers, int width,
                                      int height) {
    const uint32_t size = VCImage_requiredSize(width, height, VC_FORMAT_RGBA);
    if (size == 0) return nullptr;
    unsigned char* data = buffers->take(size);
    if (data == nullptr) data = static_cast<unsigned char*>(malloc(size));
    if (data == nullptr) return nullptr;
    return new Image(buffers, data, width, height, size);
}

void EglSnapShotBuffers::open() {
    std::lock_guard<std::mutex> guard(mLock);
    mOpen = true;
}

void EglSnapShotBuffers::close() {
    unsigned char* data;
    {
        std::lock_guard<std::mutex> guard(mLock);
        mOpen = false;
        data = mData;
        mData = nullptr;
    }
    free(data);
}

unsigned char* EglSnapShotBuffers::take(uint32_t size) {
    unsigned char* data;
    {
        std::lock_guard<std::mutex> guard(mLock);
        data = mData;
        mData = nullptr;
        if (data != nullptr && mSize == size) return data;
    }
    free(data);  // another size: the snapshot's pictures have changed
    return nullptr;
}

bool EglSnapShotBuffers::keep(unsigned char* data, uint32_t size) {
    std::lock_guard<std::mutex> guard(mLock);
    if (!mOpen || mData != nullptr) return false;
    mData = data;
    mSize = size;
    return true;
}

EglSnapShotCreateSync gEglSnapShotCreateSync = createSync;
EglSnapShotClientWait gEglSnapShotClientWait = clientWait;

int EglSnapShot_makeTarget(const android::sp<EglEnvironment>& env, int width, int height,
                           android::sp<EglImage>& target) {
    if (target != nullptr) return 0;
    target = new EglImage(env, EglImage::IMAGE_EXTERNAL_FRAMEBUFFER, width, height, VC_FORMAT_RGBA);
    const int status = target->initialize();
    if (status != 0) {
        target->release();
        target.clear();
    }
    return status;
}

int EglSnapShot_readAndPost(EglImage& target, ImageConverter& converter,
                            const std::shared_ptr<EglSnapShotBuffers>& buffers, int width,
                            int height, OnFrameListener& listener, nsecs_t timestamp,
                            const EglSnapShotNames& names) {
    VCImage* image;
    {
        VFTraceSection trace(names.getImage);
        image = target.getImageData();
    }
    if (image == nullptr) {
        EglLog(VF_LOG_ERROR, "EGL: Can't access this FBO's pixels");
        return kEglSnapShotReportUnknown;
    }
    if (image->wrapped) {
        // The converter may outlive the buffer's lock: it gets a copy of its own.
        VFTraceSection trace(names.convert);
        VCImage* copy = EglSnapShotBuffers::newImage(buffers, width, height);
        const int status = copy != nullptr ? VCImage_convert(image, copy) : VC_ERROR_ALLOC_FAILED;
        VCImage_destroy(image);
        if (status < 0) {
            const uint32_t rgba = VC_FORMAT_RGBA;
            EglLog(VF_LOG_ERROR, "EGL: Image allocation failed: %dx%d %4.4s", width, height,
                   fourcc(rgba));
            VCImage_destroy(copy);
            return VC_ERROR_UNKNOWN;
        }
        image = copy;
    }
    VFTraceSection trace(names.convertAndPost);
    if (converter.convertAndPost(image, listener, timestamp, true) != 0) {
        EglLog(VF_LOG_ERROR, "EGL: Image conversion failed");
        return kEglSnapShotReportUnknown;
    }
    return 0;
}

EGLSyncKHR EglSnapShot_createFence(EGLDisplay display, const char* source) {
    EGLSyncKHR sync = gEglSnapShotCreateSync(display, EGL_SYNC_FENCE_KHR, nullptr);
    if (!EglCheck_egl("eglCreateSyncKHR()", source, __LINE__)) {
        if (sync != EGL_NO_SYNC_KHR) EglSnapShot_destroyFence(display, sync);
        return EGL_NO_SYNC_KHR;
    }
    // The fence is waited for without a flush from another thread: submit
    // it, and the work before it, now.
    glFlush();
    return sync;
}

void EglSnapShot_destroyFence(EGLDisplay display, EGLSyncKHR sync) {
    PFNEGLDESTROYSYNCKHRPROC destroy = EglExtensions::get().eglDestroySyncKHR;
    if (sync != EGL_NO_SYNC_KHR && destroy != nullptr) destroy(display, sync);
}

bool EglSnapShot_waitFence(EGLDisplay display, EGLSyncKHR sync, uint64_t timeout,
                           OnFrameListener& listener) {
    const uint32_t format = listener.getPreferredFormat();
    EglLog(VF_LOG_DEBUG, "EGL: Waiting on snapshot fence...");
    const EGLint result = gEglSnapShotClientWait(display, sync, 0, timeout);
    if (result == EGL_TIMEOUT_EXPIRED_KHR) {
        EglLog(VF_LOG_ERROR, "EGL: Timeout expired: %lld nanoseconds. Picture failed.",
               static_cast<long long>(timeout));
        return false;
    }
    if (result != EGL_CONDITION_SATISFIED_KHR) {
        EglLog(VF_LOG_ERROR,
               "EGL: eglClientWaitSyncKHR returned an invalid error code: %x. Continuing anyway.",
               result);
    }
    EglLog(VF_LOG_DEBUG, "EGL: Waiting finished! Now converting to %4.4s on CPU...",
           fourcc(format));
    return true;
}

void EglSnapShot_logPictureFailed(int status) {
    EglLog(VF_LOG_ERROR, "EGL: Picture failed with error %d", status);
}

void EglSnapShot_drainQueue(android::WorkQueue& queue) {
    android::Mutex lock;
    android::Condition done;
    bool flag = false;
    DrainUnit* unit = new DrainUnit(lock, done, flag);
    if (queue.schedule(unit, 0) != 0) {
        delete unit;
        return;
    }
    android::Mutex::Autolock guard(lock);
    while (!flag) done.wait(lock);
}
