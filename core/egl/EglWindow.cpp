#include "core/egl/EglWindow.h"

#include <stdio.h>

#include <GLES2/gl2ext.h>
#include <android/native_window.h>
#include <gui/BufferQueue.h>
#include <gui/Surface.h>
#include <ui/GraphicBuffer.h>

#include "core/egl/EglCheck.h"
#include "core/egl/EglClock.h"
#include "core/egl/Platform.h"
#include "vccore/vc_error.h"
#include "vccore/vc_log.h"

#define VC_SOURCE "core/egl/EglWindow"

using android::BufferItem;
using android::BufferQueue;
using android::GLConsumer;
using android::GraphicBuffer;
using android::IGraphicBufferConsumer;
using android::IGraphicBufferProducer;
using android::Mutex;
using android::NO_ERROR;
using android::NO_INIT;
using android::sp;
using android::Surface;

EglFrameWaiter::EglFrameWaiter(int id)
    : mLateFrames(0),
      mFirstFrameTime(0),
      mReleased(false),
      mInterrupted(false),
      mFirstFrameSeen(false),
      mId(id),
      mFramesInBlock(0) {
    snprintf(mTraceLabel, sizeof(mTraceLabel), "KI-onFrameAvailable[%d]", id);
}

EglFrameWaiter::~EglFrameWaiter() {}

void EglFrameWaiter::onFrameAvailable(const BufferItem&) {
    VFTraceSection trace(mTraceLabel);
    Mutex::Autolock lock(mMutex);
    if (!mFirstFrameSeen) {
        mFramesInBlock = 0;
        mFirstFrameSeen = true;
        EglLog(VF_LOG_INFO, "EGL: Framewaiter #%d, 1st frame", mId);
    }
    ++mFramesInBlock;
    if (mFramesInBlock == 1) {
        mFirstFrameTime = EglClock::get().uptimeMillis();
    } else if (mFramesInBlock == kBlockFrames) {
        mFramesInBlock = 0;
        const int64_t elapsed = EglClock::get().uptimeMillis() - mFirstFrameTime;
        if (elapsed > kBlockMillis) {
            const int64_t late = (elapsed - kBlockMillis) / kFrameMillis + 1;
            mLateFrames = (int)(late > kMinLateFrames ? late : kMinLateFrames);
        }
    }
    mCondition.signal();
}

void EglFrameWaiter::onFrameReplaced(const BufferItem&) {}

void EglFrameWaiter::interrupt() {
    Mutex::Autolock lock(mMutex);
    mInterrupted = true;
    mCondition.broadcast();
}

void EglFrameWaiter::release() {
    Mutex::Autolock lock(mMutex);
    mReleased = true;
    mCondition.signal();
}

void EglFrameWaiter::waitForFirstFrame() {
    Mutex::Autolock lock(mMutex);
    // An interrupt from before the wait must not cut it short.
    mInterrupted = false;
    while (!mReleased && !mFirstFrameSeen && !mInterrupted) {
        EglClock::get().wait(mCondition, mMutex);
    }
    mInterrupted = false;
}

int EglFrameWaiter::takeLateFrames() {
    Mutex::Autolock lock(mMutex);
    const int late = mLateFrames;
    mLateFrames = 0;
    return late;
}

EglWindow::EglWindow(int id, int width, int height)
    : EglObject(width, height),
      mKind(KIND_CAMERA),
      mTexture(0),
      mFrameWaiter(new EglFrameWaiter(id)),
      mWindowInitialized(false),
      mId(id),
      mFramesToDrop(0),
      mDropPhase(0),
      mLastLatchTime(EglClock::get().bootTime()),
      mLastFrameNumber(0) {
    mTraceLabel[0] = '\0';
}

EglWindow::EglWindow(int id, const sp<GLConsumer>& consumer,
                     const sp<IGraphicBufferProducer>& producer, int width, int height)
    : EglWindow(id, width, height) {
    mKind = KIND_CONSUMER;
    mConsumer = consumer;
    mProducer = producer;
}

EglWindow::EglWindow(const sp<IGraphicBufferProducer>& producer, int width, int height)
    : EglWindow(-1, width, height) {
    mKind = KIND_OUTPUT;
    mProducer = producer;
    mFrameWaiter.clear();
}

EglWindow::~EglWindow() {}

void EglWindow::setTraceLabel(const char* suffix) {
    snprintf(mTraceLabel, sizeof(mTraceLabel), "KI-updateTexImage[%d]%s", mId, suffix);
}

int EglWindow::initialize_l() {
    switch (mKind) {
        case KIND_CAMERA: {
            if (!GL_CHECK(glGenTextures(1, &mTexture))) return VC_REPORT(VC_ERROR_UNKNOWN);
            sp<IGraphicBufferProducer> producer;
            sp<IGraphicBufferConsumer> consumer;
            BufferQueue::createBufferQueue(&producer, &consumer);
            mConsumer = new GLConsumer(consumer, mTexture, GL_TEXTURE_EXTERNAL_OES, true, false);
            mConsumer->setFrameAvailableListener(mFrameWaiter);
            mNativeWindow = new Surface(producer, false);
            return initANativeWindow();
        }
        case KIND_CONSUMER:
            // Attached to this context later, by rebindingTexImage().
            if (mConsumer != nullptr) {
                mConsumer->detachFromContext();
                mConsumer->setFrameAvailableListener(mFrameWaiter);
            }
            return 0;
        case KIND_OUTPUT:
            mNativeWindow = new Surface(mProducer, false);
            return 0;
        default:
            return VC_REPORT(VC_ERROR_INVALID_STATE);
    }
}

int EglWindow::initANativeWindow() {
    ANativeWindow* window = mNativeWindow.get();
    if (window == nullptr) {
        EglLog(VF_LOG_ERROR, "EGL Error: %s:%d", "int EglWindow::initANativeWindow()", __LINE__);
        return VC_ERROR_UNKNOWN;
    }
    if (mWidth == 0 || mHeight == 0) {
        mWidth = ANativeWindow_getWidth(window);
        mHeight = ANativeWindow_getHeight(window);
    }
    if (native_window_set_buffers_geometry(window, mWidth, mHeight, kCameraFormat) != 0) {
        EglLog(VF_LOG_ERROR, "EGL Error: %s:%d", "int EglWindow::initANativeWindow()", __LINE__);
        return VC_ERROR_UNKNOWN;
    }
    if (native_window_set_usage(window, kCameraUsage) != 0) {
        EglLog(VF_LOG_ERROR, "EGL Error: %s:%d", "int EglWindow::initANativeWindow()", __LINE__);
        return VC_ERROR_UNKNOWN;
    }
    mWindowInitialized = true;
    return 0;
}

void EglWindow::setSize(int width, int height) {
    EglObject::setSize(width, height);
    if (mNativeWindow != nullptr) {
        native_window_set_buffers_geometry(mNativeWindow.get(), width, height, kCameraFormat);
    }
}

sp<ANativeWindow> EglWindow::getANativeWindow() {
    return mNativeWindow;
}

uint32_t EglWindow::getCurrentTransform() {
    if (mKind == KIND_OUTPUT || mConsumer == nullptr) return 0;
    return mConsumer->getCurrentTransform();
}

int EglWindow::rebindingTexImage() {
    if (mConsumer == nullptr) {
        EglLog(VF_LOG_ERROR, "EGL: not initialized");
        return VC_REPORT(VC_ERROR_INVALID_STATE);
    }
    GLuint texture = 0;
    if (!GL_CHECK(glGenTextures(1, &texture))) return VC_REPORT(VC_ERROR_UNKNOWN);
    if (mConsumer->attachToContext(texture) != NO_ERROR) {
        glDeleteTextures(1, &texture);
        return VC_REPORT(VC_ERROR_UNKNOWN);
    }
    mTexture = texture;
    return 0;
}

VCImage* EglWindow::getImageData() {
    if (mConsumer == nullptr) {
        EglLog(VF_LOG_ERROR, "EGL: not initialized");
        return nullptr;
    }
    sp<GraphicBuffer> buffer = mConsumer->getCurrentBuffer();
    if (buffer == nullptr) {
        EglLog(VF_LOG_ERROR, "Failed to get the current buffer");
        return nullptr;
    }
    VCImage* locked = Platform::lockGraphicBuffer(buffer, Platform::LOCK_COMPACT, kCameraFormat,
                                                  GraphicBuffer::USAGE_SW_READ_OFTEN);
    if (locked == nullptr) {
        EglLog(VF_LOG_ERROR, "Failed to lock the pixels");
        return nullptr;
    }
    // A copy: the camera writes the buffer again once the next frame is latched.
    VCImage* copy = VCImage_clone(locked);
    VCImage_destroy(locked);
    buffer->unlock();
    return copy;
}

bool EglWindow::checkSurfaceWorking() {
    if (mKind != KIND_OUTPUT || mProducer == nullptr) return false;
    int value = 0;
    return mProducer->query(NATIVE_WINDOW_WIDTH, &value) != NO_INIT;
}

int EglWindow::updateTexImage(long long noWait) {
    if (mKind == KIND_OUTPUT) return VC_REPORT(VC_ERROR_UNSUPPORTED);
    // Held here: a release from another thread must not pull them away
    // while this latch waits.
    pthread_mutex_lock(&mMutex);
    sp<GLConsumer> consumer = mConsumer;
    sp<EglFrameWaiter> waiter = mFrameWaiter;
    pthread_mutex_unlock(&mMutex);
    if (consumer == nullptr || waiter == nullptr) {
        EglLog(VF_LOG_ERROR, "EGL: not initialized");
        return VC_REPORT(VC_ERROR_INVALID_STATE);
    }
    GL_CHECK(glBindTexture(GL_TEXTURE_EXTERNAL_OES, mTexture));
    setTraceLabel(noWait != 0 ? "" : "-wait");
    VFTraceSection trace(mTraceLabel);
    if (noWait == 0) waiter->waitForFirstFrame();
    consumer->updateTexImage();
    return 0;
}

int EglWindow::updateTexImage() {
    if (mKind == KIND_OUTPUT) return VC_REPORT(VC_ERROR_UNSUPPORTED);
    if (mConsumer == nullptr) {
        EglLog(VF_LOG_ERROR, "EGL: not initialized");
        return VC_REPORT(VC_ERROR_INVALID_STATE);
    }
    if (mKind == KIND_CONSUMER) {
        if (mConsumer->updateTexImage() != NO_ERROR) return 0;
        uint64_t frame = mConsumer->getFrameNumber();
        if (frame == mLastFrameNumber) return kNoNewFrame;
        while (mConsumer->updateTexImage() == NO_ERROR) {
            const uint64_t next = mConsumer->getFrameNumber();
            if (next == frame) break;
            frame = next;
        }
        mLastFrameNumber = frame;
        return 0;
    }
    GL_CHECK(glBindTexture(GL_TEXTURE_EXTERNAL_OES, mTexture));
    const int64_t delay = checkFrameDelay();
    if (delay > 0) {
        mFramesToDrop += (int)delay;
        mDropPhase = 1;
    }
    const int late = mFrameWaiter != nullptr ? mFrameWaiter->takeLateFrames() : 0;
    if (late > 0) {
        mFramesToDrop += late;
        mDropPhase = 1;
    }
    if (mFramesToDrop.load() > 0 && (++mDropPhase % 2) == 0) {
        --mFramesToDrop;
        setTraceLabel("-delay");
        VFTraceSection trace(mTraceLabel);
        // Drains the queue: the newest frame is the one latched.
        if (mConsumer->updateTexImage() == NO_ERROR) {
            uint64_t frame = mConsumer->getFrameNumber();
            while (mConsumer->updateTexImage() == NO_ERROR) {
                const uint64_t next = mConsumer->getFrameNumber();
                if (next == frame) break;
                frame = next;
            }
        }
        return 0;
    }
    setTraceLabel("");
    VFTraceSection trace(mTraceLabel);
    mConsumer->updateTexImage();
    return 0;
}

int64_t EglWindow::checkFrameDelay() {
    const int64_t now = EglClock::get().bootTime();
    const int64_t gap = now - mLastLatchTime;
    mLastLatchTime = now;
    return gap <= kMaxLatchGap ? 0 : gap / kDelayUnit + 1;
}

void EglWindow::flushTexImage() {
    mFramesToDrop += kFlushFrames;
}

void EglWindow::requestRender() {
    // From client threads, while the render thread may release the window.
    pthread_mutex_lock(&mMutex);
    sp<EglFrameWaiter> waiter = mFrameWaiter;
    pthread_mutex_unlock(&mMutex);
    if (waiter != nullptr) waiter->interrupt();
}

void EglWindow::release_l() {
    if (mTexture != 0) {
        GL_CHECK(glDeleteTextures(1, &mTexture));
        mTexture = 0;
    }
    mConsumer.clear();
    mProducer.clear();
    mNativeWindow.clear();
    if (mFrameWaiter != nullptr) {
        // A latch blocked on the first frame returns.
        mFrameWaiter->release();
        mFrameWaiter.clear();
    }
    mWindowInitialized = false;
}
