// What the two snapshot classes share: reading their render target back and
// posting it through the converter, and the job that waits for a capture's
// fence on the snapshot's work queue before doing so.
#ifndef CORE_EGL_EGLSNAPSHOTCOMMON_H
#define CORE_EGL_EGLSNAPSHOTCOMMON_H

#include <EGL/egl.h>
#include <EGL/eglext.h>
#include <utils/StrongPointer.h>
#include <utils/Timers.h>

#include <memory>
#include <mutex>

#include "core/egl/EglEnvironment.h"
#include "core/egl/ImageConverter.h"
#include "core/egl/WorkQueue.h"

class EglImage;

// Where the picture-sized RGBA images a snapshot posts get their memory. The
// converter destroys each image once it has posted it; the buffer then comes
// back here rather than to the system, and the next capture writes into memory
// already mapped instead of faulting a fresh buffer in a page at a time (12 MP:
// about 12,000 faults, several milliseconds). One buffer is kept, and only
// while the snapshot is open. Images in flight share this and may outlive the
// snapshot.
class EglSnapShotBuffers {
public:
    EglSnapShotBuffers() = default;
    ~EglSnapShotBuffers();
    EglSnapShotBuffers(const EglSnapShotBuffers&) = delete;
    EglSnapShotBuffers& operator=(const EglSnapShotBuffers&) = delete;

    // An owned RGBA image of width x height for VCImage_destroy, on the kept
    // buffer when it has the size; null when memory runs out.
    static VCImage* newImage(const std::shared_ptr<EglSnapShotBuffers>& buffers, int width,
                             int height);
    // Keeps the buffers of destroyed images from now on.
    void open();
    // Frees the kept buffer and keeps none until opened again.
    void close();

private:
    class Image;
    unsigned char* take(uint32_t size);
    // False when the buffer is not kept: the caller frees it.
    bool keep(unsigned char* data, uint32_t size);

    std::mutex mLock;
    unsigned char* mData = nullptr;
    uint32_t mSize = 0;
    bool mOpen = false;
};

// Trace labels of a read-back.
struct EglSnapShotNames {
    const char* getImage;
    const char* convert;
    const char* convertAndPost;
};

// The render target of a snapshot, a buffer-backed RGBA framebuffer, made
// once; on failure target stays null.
int EglSnapShot_makeTarget(const android::sp<EglEnvironment>& env, int width, int height,
                           android::sp<EglImage>& target);

// A failed read-back whose VC_ERROR_UNKNOWN line the caller still reports
// (so that it names the caller's source).
const int kEglSnapShotReportUnknown = -100;

// Reads target (width x height RGBA), copies it out of the locked buffer into
// an image of buffers when it only wraps that memory, and hands it to
// converter, which takes it. 0, VC_ERROR_UNKNOWN (its lines logged) or
// kEglSnapShotReportUnknown.
int EglSnapShot_readAndPost(EglImage& target, ImageConverter& converter,
                            const std::shared_ptr<EglSnapShotBuffers>& buffers, int width,
                            int height, OnFrameListener& listener, nsecs_t timestamp,
                            const EglSnapShotNames& names);

// A fence after the GPU work queued so far on the current context, or
// EGL_NO_SYNC_KHR (logged as an EGL error) when none can be made.
EGLSyncKHR EglSnapShot_createFence(EGLDisplay display, const char* source);

// Making a capture's fence and waiting for it; tests may replace them to play
// a platform without fences or a fence that never signals.
typedef EGLSyncKHR (*EglSnapShotCreateSync)(EGLDisplay display, EGLenum type,
                                            const EGLint* attributes);
typedef EGLint (*EglSnapShotClientWait)(EGLDisplay display, EGLSyncKHR sync, EGLint flags,
                                        EGLTimeKHR timeout);
extern EglSnapShotCreateSync gEglSnapShotCreateSync;
extern EglSnapShotClientWait gEglSnapShotClientWait;

// Waits for the fence of one asynchronous capture of Snapshot (which the
// snapshot outlives: its release and destructor drain its queue), then reads
// back and posts. Snapshot provides readAndPost(listener, timestamp) and
// abandonCapture(), called instead when the wait failed.
template <class Snapshot>
class EglSnapShotWaitJob : public android::WorkQueue::WorkUnit {
public:
    EglSnapShotWaitJob(Snapshot& snapshot, OnFrameListener& listener, nsecs_t timestamp,
                       EGLDisplay display, EGLSyncKHR sync, uint64_t timeout)
        : mSnapshot(snapshot),
          mListener(listener),
          mTimestamp(timestamp),
          mDisplay(display),
          mSync(sync),
          mTimeout(timeout) {}
    ~EglSnapShotWaitJob() override;
    bool run() override;

private:
    Snapshot& mSnapshot;
    OnFrameListener& mListener;
    nsecs_t mTimestamp;
    EGLDisplay mDisplay;
    EGLSyncKHR mSync;
    uint64_t mTimeout;
};

// The job's steps that do not depend on the snapshot's class: false when the
// wait timed out and nothing is to be posted.
bool EglSnapShot_waitFence(EGLDisplay display, EGLSyncKHR sync, uint64_t timeout,
                           OnFrameListener& listener);
void EglSnapShot_destroyFence(EGLDisplay display, EGLSyncKHR sync);
void EglSnapShot_logPictureFailed(int status);

template <class Snapshot>
EglSnapShotWaitJob<Snapshot>::~EglSnapShotWaitJob() {
    EglSnapShot_destroyFence(mDisplay, mSync);
}

template <class Snapshot>
bool EglSnapShotWaitJob<Snapshot>::run() {
    if (!EglSnapShot_waitFence(mDisplay, mSync, mTimeout, mListener)) {
        mSnapshot.abandonCapture();
        return true;
    }
    int status = mSnapshot.readAndPost(mListener, mTimestamp);
    if (status != 0) EglSnapShot_logPictureFailed(status);
    return true;
}

// Runs after everything already on a one-thread queue: returns once the
// queue's earlier jobs are done (at once when the queue takes no more work).
void EglSnapShot_drainQueue(android::WorkQueue& queue);

#endif
