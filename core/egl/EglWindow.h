// One buffer stream between a producer outside the render thread and the GL
// context: a camera input with a buffer queue of its own (kind 0), an input
// on a GLConsumer the client supplies (kind 1), or an output on a producer
// the client supplies, such as a video encoder's input (kind 2).
//
// Inputs pace the render thread against the camera: the frame waiter counts
// arriving frames and measures how far behind the consumer is, and the
// per-frame latch drops queued frames to catch up, on every second render
// only, so that a late consumer skips frames without stalling on each one.
// The waits and clocks go through EglClock.
#ifndef CORE_EGL_EGLWINDOW_H
#define CORE_EGL_EGLWINDOW_H

#include <stdint.h>

#include <atomic>

#include <GLES2/gl2.h>
#include <gui/GLConsumer.h>
#include <gui/IGraphicBufferProducer.h>
#include <system/window.h>
#include <utils/Condition.h>
#include <utils/Mutex.h>

#include "core/egl/EglObject.h"
#include "vccore/vc_image.h"

class EglFrameWaiter : public android::ConsumerBase::FrameAvailableListener {
public:
    // Frames in a block of the late-frame measurement, and the time the
    // block may take (24 frames at 41 ms).
    static constexpr int kBlockFrames = 24;
    static constexpr int64_t kBlockMillis = 984;
    static constexpr int64_t kFrameMillis = 41;
    // Once late, the consumer catches up by at least this many frames.
    static constexpr int kMinLateFrames = 4;

    explicit EglFrameWaiter(int id);

    // On the buffer queue's thread.
    void onFrameAvailable(const android::BufferItem& item) override;
    void onFrameReplaced(const android::BufferItem& item) override;
    ~EglFrameWaiter() override;
    // Ends a first-frame wait now (the latch goes on without a new frame).
    virtual void interrupt();
    // Ends every first-frame wait, now and later.
    virtual void release();

    // Render thread: until the first frame, a release or an interrupt that
    // comes once the wait began.
    void waitForFirstFrame();
    // Render thread: the late frames counted so far, zeroed.
    int takeLateFrames();

private:
    int mLateFrames;
    int64_t mFirstFrameTime;  // ms of uptimeMillis
    bool mReleased;
    bool mInterrupted;
    bool mFirstFrameSeen;
    int mId;
    int mFramesInBlock;
    char mTraceLabel[50];
    android::Mutex mMutex;
    android::Condition mCondition;
};

class EglWindow : public EglObject {
public:
    enum Kind { KIND_CAMERA = 0, KIND_CONSUMER = 1, KIND_OUTPUT = 2 };

    // The pixel format and usage a camera input asks of its window: NV21,
    // software write often.
    static constexpr int kCameraFormat = 17;
    static constexpr int kCameraUsage = 0x30;
    // A gap between latches above this adds catch-up debt, one frame per
    // started kDelayUnit.
    static constexpr nsecs_t kMaxLatchGap = 60000000;
    static constexpr nsecs_t kDelayUnit = 200000000;
    // What flushTexImage() adds to the frames to drop.
    static constexpr int kFlushFrames = 24;
    // updateTexImage() of a kind-1 window when no new frame came.
    static constexpr int kNoNewFrame = 256;

    EglWindow(int id, int width, int height);
    EglWindow(int id, const android::sp<android::GLConsumer>& consumer,
              const android::sp<android::IGraphicBufferProducer>& producer, int width, int height);
    EglWindow(const android::sp<android::IGraphicBufferProducer>& producer, int width, int height);
    ~EglWindow() override;

    int initANativeWindow();
    void setSize(int width, int height) override;
    android::sp<ANativeWindow> getANativeWindow();
    uint32_t getCurrentTransform();
    int rebindingTexImage();
    // A copy of the consumer's current frame (the caller destroys it), or null.
    VCImage* getImageData();
    bool checkSurfaceWorking();

    // Latch without catching up: noWait non-zero never waits; zero waits for
    // the camera's first frame only.
    int updateTexImage(long long noWait);
    // The per-frame latch, catching up on late frames.
    int updateTexImage();
    void flushTexImage();
    void requestRender();

    int getKind() const { return mKind; }
    int getId() const { return mId; }
    GLuint getTexture() const { return mTexture; }

protected:
    int initialize_l() override;
    void release_l() override;

private:
    // Catch-up debt from the gap since the last latch; restamps the latch time.
    int64_t checkFrameDelay();
    void setTraceLabel(const char* suffix);

    int mKind;
    GLuint mTexture;
    android::sp<android::GLConsumer> mConsumer;
    android::sp<android::IGraphicBufferProducer> mProducer;
    android::sp<ANativeWindow> mNativeWindow;
    android::sp<EglFrameWaiter> mFrameWaiter;
    bool mWindowInitialized;
    int mId;
    // Atomic: flushTexImage() comes from client threads.
    std::atomic<int> mFramesToDrop;
    int mDropPhase;
    int64_t mLastLatchTime;  // ns, boot clock
    uint64_t mLastFrameNumber;
    char mTraceLabel[50];
};

#endif
