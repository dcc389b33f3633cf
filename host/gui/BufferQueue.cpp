// The host buffer queue: one core of slots and a FIFO, shared by a producer
// object and a consumer object. Frame-available callbacks run on the thread
// of the producer call that queued the frame, after the queue's lock is let
// go, one at a time and in queue order.
#include <gui/BufferQueue.h>

#include <deque>

#include <system/window.h>
#include <utils/Condition.h>
#include <utils/Mutex.h>

#include "core/egl/EglClock.h"
#include "core/egl/EglExtensions.h"
#include "vccore/vc_log.h"

namespace android {

namespace {

enum SlotState { FREE, DEQUEUED, QUEUED, ACQUIRED };

struct Slot {
    sp<GraphicBuffer> buffer;
    SlotState state = FREE;
    BufferItem item;  // the frame, while queued or acquired
    // The consumer's release fence, waited for before the next dequeue.
    EGLDisplay fenceDisplay = EGL_NO_DISPLAY;
    EGLSyncKHR fence = EGL_NO_SYNC_KHR;
};

void destroyFence(EGLDisplay display, EGLSyncKHR fence) {
    if (fence != EGL_NO_SYNC_KHR) EglExtensions::get().eglDestroySyncKHR(display, fence);
}

struct BufferQueueCore : public virtual RefBase {
    Mutex mMutex;
    Condition mDequeueCondition;  // a slot became free, or the queue was abandoned
    Mutex mCallbackMutex;         // keeps frame-available callbacks in order
    Slot mSlots[BufferQueue::NUM_BUFFER_SLOTS];
    std::deque<int> mQueue;
    int mBufferCount = BufferQueue::kDefaultBufferCount;
    int mMaxAcquired = 1;
    bool mAbandoned = false;
    bool mConsumerConnected = false;
    wp<IConsumerListener> mListener;
    int mConnectedApi = 0;
    bool mAsync = false;
    nsecs_t mDequeueTimeout = -1;
    uint32_t mDefaultWidth = 1;
    uint32_t mDefaultHeight = 1;
    PixelFormat mDefaultFormat = PIXEL_FORMAT_RGBA_8888;
    uint64_t mConsumerUsage = 0;
    uint64_t mFrameCounter = 0;
    uint64_t mDropped = 0;
    String8 mName;

    ~BufferQueueCore() {
        for (Slot& slot : mSlots) destroyFence(slot.fenceDisplay, slot.fence);
    }

    bool validSlot_l(int slot) const { return slot >= 0 && slot < mBufferCount; }

    int count_l(SlotState state) const {
        int n = 0;
        for (int i = 0; i < mBufferCount; ++i) n += mSlots[i].state == state ? 1 : 0;
        return n;
    }

    // Drops every buffer and pending fence; a consumer keeps the references
    // it took itself.
    void freeBuffers_l() {
        for (Slot& slot : mSlots) {
            destroyFence(slot.fenceDisplay, slot.fence);
            slot = Slot();
        }
        mQueue.clear();
    }
};

class BufferQueueProducer : public IGraphicBufferProducer {
public:
    explicit BufferQueueProducer(const sp<BufferQueueCore>& core) : mCore(core) {}

    status_t requestBuffer(int slot, sp<GraphicBuffer>* buffer) override {
        if (buffer == nullptr) return BAD_VALUE;
        Mutex::Autolock lock(mCore->mMutex);
        if (mCore->mAbandoned) return NO_INIT;
        if (!mCore->validSlot_l(slot) || mCore->mSlots[slot].state != DEQUEUED) return BAD_VALUE;
        *buffer = mCore->mSlots[slot].buffer;
        return NO_ERROR;
    }

    status_t dequeueBuffer(int* outSlot, uint32_t width, uint32_t height, PixelFormat format,
                           uint64_t usage) override {
        if (outSlot == nullptr) return BAD_VALUE;
        BufferQueueCore& c = *mCore;
        Mutex::Autolock lock(c.mMutex);
        const nsecs_t start = EglClock::get().bootTime();
        int found = -1;
        for (;;) {
            if (c.mAbandoned) return NO_INIT;
            for (int i = 0; i < c.mBufferCount && found < 0; ++i) {
                if (c.mSlots[i].state == FREE) found = i;
            }
            if (found >= 0) break;
            if (c.mAsync && !c.mQueue.empty()) {
                // The oldest frame nobody took makes room: a display shows
                // the newest frame, and the producer must not wait for it.
                found = c.mQueue.front();
                c.mQueue.pop_front();
                ++c.mDropped;
                break;
            }
            // Every slot with the producer: no release can ever come.
            if (c.count_l(DEQUEUED) == c.mBufferCount) return INVALID_OPERATION;
            if (c.mAsync || c.mDequeueTimeout == 0) return WOULD_BLOCK;
            if (c.mDequeueTimeout < 0) {
                EglClock::get().wait(c.mDequeueCondition, c.mMutex);
            } else {
                const nsecs_t left = c.mDequeueTimeout - (EglClock::get().bootTime() - start);
                if (left <= 0 || EglClock::get().waitRelative(c.mDequeueCondition, c.mMutex,
                                                              left) == TIMED_OUT) {
                    return TIMED_OUT;
                }
            }
        }
        Slot& slot = c.mSlots[found];
        slot.state = DEQUEUED;
        slot.item = BufferItem();
        if (slot.fence != EGL_NO_SYNC_KHR) {
            // The consumer may still be reading the buffer on the GPU.
            EGLDisplay display = slot.fenceDisplay;
            EGLSyncKHR fence = slot.fence;
            slot.fence = EGL_NO_SYNC_KHR;
            c.mMutex.unlock();
            EglExtensions::get().eglClientWaitSyncKHR(display, fence, 0, EGL_FOREVER_KHR);
            destroyFence(display, fence);
            c.mMutex.lock();
            if (c.mAbandoned) return NO_INIT;
        }
        const uint32_t w = width != 0 ? width : c.mDefaultWidth;
        const uint32_t h = height != 0 ? height : c.mDefaultHeight;
        const PixelFormat f = format != 0 ? format : c.mDefaultFormat;
        const uint64_t u = usage | c.mConsumerUsage;
        status_t result = NO_ERROR;
        if (slot.buffer == nullptr || slot.buffer->getWidth() != w ||
            slot.buffer->getHeight() != h || slot.buffer->getPixelFormat() != f ||
            slot.buffer->getUsage() != u) {
            sp<GraphicBuffer> fresh = new GraphicBuffer(w, h, f, (uint32_t)u, "BufferQueue");
            if (fresh->initCheck() != NO_ERROR) {
                slot.state = FREE;
                c.mDequeueCondition.broadcast();
                return fresh->initCheck();
            }
            slot.buffer = fresh;
            result = BUFFER_NEEDS_REALLOCATION;
        }
        *outSlot = found;
        return result;
    }

    status_t queueBuffer(int slot, const QueueBufferInput& input,
                         QueueBufferOutput* output) override {
        BufferQueueCore& c = *mCore;
        c.mMutex.lock();
        if (c.mAbandoned) {
            c.mMutex.unlock();
            return NO_INIT;
        }
        if (!c.validSlot_l(slot) || c.mSlots[slot].state != DEQUEUED) {
            c.mMutex.unlock();
            VF_LogMsg(VF_LOG_ERROR, "BufferQueue: queueBuffer: slot %d is not dequeued", slot);
            return BAD_VALUE;
        }
        Slot& s = c.mSlots[slot];
        s.state = QUEUED;
        BufferItem& item = s.item;
        item.mGraphicBuffer = s.buffer;
        item.mSlot = slot;
        item.mFrameNumber = ++c.mFrameCounter;
        item.mTimestamp = input.timestamp;
        item.mIsAutoTimestamp = input.isAutoTimestamp;
        item.mTransform = input.transform;
        item.mScalingMode = input.scalingMode;
        c.mQueue.push_back(slot);
        fillOutput_l(output);
        const BufferItem queued = item;
        sp<IConsumerListener> listener = c.mListener.promote();
        // Taken before the queue's lock is let go, so callbacks keep queue order.
        c.mCallbackMutex.lock();
        c.mMutex.unlock();
        if (listener != nullptr) listener->onFrameAvailable(queued);
        c.mCallbackMutex.unlock();
        return NO_ERROR;
    }

    status_t cancelBuffer(int slot) override {
        Mutex::Autolock lock(mCore->mMutex);
        if (mCore->mAbandoned) return NO_INIT;
        if (!mCore->validSlot_l(slot) || mCore->mSlots[slot].state != DEQUEUED) return BAD_VALUE;
        mCore->mSlots[slot].state = FREE;
        mCore->mDequeueCondition.broadcast();
        return NO_ERROR;
    }

    int query(int what, int* value) override {
        if (value == nullptr) return BAD_VALUE;
        BufferQueueCore& c = *mCore;
        Mutex::Autolock lock(c.mMutex);
        if (c.mAbandoned) return NO_INIT;
        switch (what) {
            case NATIVE_WINDOW_WIDTH:
            case NATIVE_WINDOW_DEFAULT_WIDTH:
                *value = (int)c.mDefaultWidth;
                return NO_ERROR;
            case NATIVE_WINDOW_HEIGHT:
            case NATIVE_WINDOW_DEFAULT_HEIGHT:
                *value = (int)c.mDefaultHeight;
                return NO_ERROR;
            case NATIVE_WINDOW_FORMAT:
                *value = c.mDefaultFormat;
                return NO_ERROR;
            case NATIVE_WINDOW_MIN_UNDEQUEUED_BUFFERS:
                *value = c.mMaxAcquired;
                return NO_ERROR;
            case NATIVE_WINDOW_QUEUES_TO_WINDOW_COMPOSER:
            case NATIVE_WINDOW_TRANSFORM_HINT:
                *value = 0;
                return NO_ERROR;
            case NATIVE_WINDOW_CONCRETE_TYPE:
                *value = NATIVE_WINDOW_SURFACE;
                return NO_ERROR;
            case NATIVE_WINDOW_CONSUMER_RUNNING_BEHIND:
                *value = c.mQueue.size() >= 2 ? 1 : 0;
                return NO_ERROR;
            case NATIVE_WINDOW_CONSUMER_USAGE_BITS:
                *value = (int)c.mConsumerUsage;
                return NO_ERROR;
            default:
                return BAD_VALUE;
        }
    }

    status_t connect(int api, bool, QueueBufferOutput* output) override {
        BufferQueueCore& c = *mCore;
        Mutex::Autolock lock(c.mMutex);
        if (c.mAbandoned || !c.mConsumerConnected) return NO_INIT;
        if (api < NATIVE_WINDOW_API_EGL || api > NATIVE_WINDOW_API_CAMERA) return BAD_VALUE;
        if (c.mConnectedApi != 0) return BAD_VALUE;
        c.mConnectedApi = api;
        fillOutput_l(output);
        return NO_ERROR;
    }

    status_t disconnect(int api) override {
        BufferQueueCore& c = *mCore;
        Mutex::Autolock lock(c.mMutex);
        if (c.mAbandoned) {
            c.mConnectedApi = 0;
            return NO_ERROR;  // nothing left to tell: let the producer clean up
        }
        if (api != c.mConnectedApi || api == 0) return BAD_VALUE;
        // Frames already queued stay for the consumer.
        c.mConnectedApi = 0;
        c.mDequeueCondition.broadcast();
        return NO_ERROR;
    }

    status_t setBufferCount(int count) override {
        BufferQueueCore& c = *mCore;
        Mutex::Autolock lock(c.mMutex);
        if (c.mAbandoned) return NO_INIT;
        if (count < 0 || count > BufferQueue::NUM_BUFFER_SLOTS) return BAD_VALUE;
        if (c.count_l(DEQUEUED) > 0 || c.count_l(ACQUIRED) > 0) return INVALID_OPERATION;
        // Like a reconfigured queue on a device, queued frames are forgotten.
        c.freeBuffers_l();
        c.mBufferCount = count == 0 ? BufferQueue::kDefaultBufferCount : count;
        c.mDequeueCondition.broadcast();
        sp<IConsumerListener> listener = c.mListener.promote();
        if (listener != nullptr) listener->onBuffersReleased();
        return NO_ERROR;
    }

    status_t setAsyncMode(bool async) override {
        Mutex::Autolock lock(mCore->mMutex);
        if (mCore->mAbandoned) return NO_INIT;
        mCore->mAsync = async;
        mCore->mDequeueCondition.broadcast();
        return NO_ERROR;
    }

    status_t setDequeueTimeout(nsecs_t timeout) override {
        Mutex::Autolock lock(mCore->mMutex);
        if (mCore->mAbandoned) return NO_INIT;
        mCore->mDequeueTimeout = timeout;
        return NO_ERROR;
    }

private:
    void fillOutput_l(QueueBufferOutput* output) {
        if (output == nullptr) return;
        output->width = mCore->mDefaultWidth;
        output->height = mCore->mDefaultHeight;
        output->transformHint = 0;
        output->numPendingBuffers = (uint32_t)mCore->mQueue.size();
        output->nextFrameNumber = mCore->mFrameCounter + 1;
    }

    const sp<BufferQueueCore> mCore;
};

class BufferQueueConsumer : public IGraphicBufferConsumer {
public:
    explicit BufferQueueConsumer(const sp<BufferQueueCore>& core) : mCore(core) {}
    // A consumer that goes away abandons the queue, so the producer learns it.
    ~BufferQueueConsumer() override { consumerDisconnect(); }

    status_t acquireBuffer(BufferItem* item, nsecs_t) override {
        if (item == nullptr) return BAD_VALUE;
        BufferQueueCore& c = *mCore;
        Mutex::Autolock lock(c.mMutex);
        if (c.mAbandoned) return NO_INIT;
        if (c.mQueue.empty()) return NO_BUFFER_AVAILABLE;
        if (c.count_l(ACQUIRED) > c.mMaxAcquired) return INVALID_OPERATION;
        const int slot = c.mQueue.front();
        c.mQueue.pop_front();
        c.mSlots[slot].state = ACQUIRED;
        *item = c.mSlots[slot].item;
        return NO_ERROR;
    }

    status_t releaseBuffer(int slot, uint64_t frameNumber, EGLDisplay display,
                           EGLSyncKHR fence) override {
        BufferQueueCore& c = *mCore;
        Mutex::Autolock lock(c.mMutex);
        if (slot < 0 || slot >= BufferQueue::NUM_BUFFER_SLOTS) {
            destroyFence(display, fence);
            return BAD_VALUE;
        }
        Slot& s = c.mSlots[slot];
        if (s.state != ACQUIRED || s.item.mFrameNumber != frameNumber) {
            destroyFence(display, fence);
            return s.state == ACQUIRED || c.mAbandoned ? (status_t)STALE_BUFFER_SLOT : BAD_VALUE;
        }
        if (c.mAbandoned || slot >= c.mBufferCount) {
            destroyFence(display, fence);
            s = Slot();
            return NO_ERROR;
        }
        s.state = FREE;
        s.item = BufferItem();
        s.fenceDisplay = display;
        s.fence = fence;
        c.mDequeueCondition.broadcast();
        return NO_ERROR;
    }

    status_t consumerConnect(const sp<IConsumerListener>& listener, bool) override {
        Mutex::Autolock lock(mCore->mMutex);
        if (mCore->mAbandoned) return NO_INIT;
        mCore->mListener = listener;
        mCore->mConsumerConnected = true;
        return NO_ERROR;
    }

    status_t consumerDisconnect() override {
        BufferQueueCore& c = *mCore;
        Mutex::Autolock lock(c.mMutex);
        if (c.mAbandoned) return NO_ERROR;
        c.mAbandoned = true;
        c.mConsumerConnected = false;
        c.mListener.clear();
        c.freeBuffers_l();
        c.mDequeueCondition.broadcast();
        return NO_ERROR;
    }

    status_t setDefaultBufferSize(uint32_t width, uint32_t height) override {
        if (width == 0 || height == 0) return BAD_VALUE;
        Mutex::Autolock lock(mCore->mMutex);
        mCore->mDefaultWidth = width;
        mCore->mDefaultHeight = height;
        return NO_ERROR;
    }

    status_t setDefaultBufferFormat(PixelFormat format) override {
        Mutex::Autolock lock(mCore->mMutex);
        mCore->mDefaultFormat = format;
        return NO_ERROR;
    }

    status_t setConsumerUsageBits(uint64_t usage) override {
        Mutex::Autolock lock(mCore->mMutex);
        mCore->mConsumerUsage = usage;
        return NO_ERROR;
    }

    status_t setMaxAcquiredBufferCount(int count) override {
        Mutex::Autolock lock(mCore->mMutex);
        if (count < 1 || count >= mCore->mBufferCount) return BAD_VALUE;
        mCore->mMaxAcquired = count;
        return NO_ERROR;
    }

    status_t setConsumerName(const String8& name) override {
        Mutex::Autolock lock(mCore->mMutex);
        mCore->mName = name;
        return NO_ERROR;
    }

    QueueStats getQueueStats() override {
        Mutex::Autolock lock(mCore->mMutex);
        QueueStats stats;
        stats.queued = mCore->mFrameCounter;
        stats.dropped = mCore->mDropped;
        stats.pending = mCore->mQueue.size();
        stats.bufferCount = mCore->mBufferCount;
        return stats;
    }

private:
    const sp<BufferQueueCore> mCore;
};

}  // namespace

void BufferQueue::createBufferQueue(sp<IGraphicBufferProducer>* outProducer,
                                    sp<IGraphicBufferConsumer>* outConsumer, bool) {
    sp<BufferQueueCore> core = new BufferQueueCore();
    if (outProducer != nullptr) *outProducer = new BufferQueueProducer(core);
    if (outConsumer != nullptr) *outConsumer = new BufferQueueConsumer(core);
}

}  // namespace android
