#include <gui/HostWindow.h>

#include <errno.h>
#include <stdarg.h>

#include <utils/Timers.h>

namespace android {

HostWindow::HostWindow(uint32_t width, uint32_t height, PixelFormat format)
    : mDefaultWidth(width),
      mDefaultHeight(height),
      mDefaultFormat(format),
      mWidth(0),
      mHeight(0),
      mFormat(0),
      mUsage(GraphicBuffer::USAGE_HW_RENDER | GraphicBuffer::USAGE_HW_TEXTURE |
             GraphicBuffer::USAGE_SW_READ_OFTEN),
      mConnectedApi(0),
      mNextTimestamp(0),
      mSlots(kDefaultBufferCount),
      mFrameCounter(0),
      mDropped(0) {
    common.incRef = hookIncRef;
    common.decRef = hookDecRef;
    ANativeWindow::setSwapInterval = hookSetSwapInterval;
    ANativeWindow::dequeueBuffer = hookDequeueBuffer;
    ANativeWindow::queueBuffer = hookQueueBuffer;
    ANativeWindow::cancelBuffer = hookCancelBuffer;
    ANativeWindow::query = hookQuery;
    ANativeWindow::perform = hookPerform;
    dequeueBuffer_DEPRECATED = nullptr;
    lockBuffer_DEPRECATED = nullptr;
    queueBuffer_DEPRECATED = nullptr;
    cancelBuffer_DEPRECATED = nullptr;
}

HostWindow::~HostWindow() {}

HostWindow* HostWindow::self(ANativeWindow* window) {
    return static_cast<HostWindow*>(window);
}

void HostWindow::hookIncRef(android_native_base_t* base) {
    HostWindow* window = self(reinterpret_cast<ANativeWindow*>(base));
    window->incStrong(window);
}

void HostWindow::hookDecRef(android_native_base_t* base) {
    HostWindow* window = self(reinterpret_cast<ANativeWindow*>(base));
    window->decStrong(window);
}

int HostWindow::hookSetSwapInterval(ANativeWindow*, int) {
    return NO_ERROR;
}

int HostWindow::hookDequeueBuffer(ANativeWindow* window, ANativeWindowBuffer** buffer,
                                  int* fenceFd) {
    if (fenceFd != nullptr) *fenceFd = -1;
    return self(window)->dequeue(buffer);
}

int HostWindow::hookQueueBuffer(ANativeWindow* window, ANativeWindowBuffer* buffer, int) {
    return self(window)->queue(buffer);
}

int HostWindow::hookCancelBuffer(ANativeWindow* window, ANativeWindowBuffer* buffer, int) {
    return self(window)->cancel(buffer);
}

int HostWindow::hookQuery(const ANativeWindow* window, int what, int* value) {
    return self(const_cast<ANativeWindow*>(window))->queryValue(what, value);
}

int HostWindow::hookPerform(ANativeWindow* window, int operation, ...) {
    va_list args;
    va_start(args, operation);
    int result = self(window)->performOperation(operation, args);
    va_end(args);
    return result;
}

int HostWindow::findSlot_l(ANativeWindowBuffer* buffer) {
    for (size_t i = 0; i < mSlots.size(); ++i) {
        if (mSlots[i].buffer != nullptr && mSlots[i].buffer->getNativeBuffer() == buffer) {
            return (int)i;
        }
    }
    return -1;
}

int HostWindow::dequeue(ANativeWindowBuffer** buffer) {
    if (buffer == nullptr) return BAD_VALUE;
    std::lock_guard<std::mutex> guard(mLock);
    int chosen = -1;
    for (size_t i = 0; i < mSlots.size() && chosen < 0; ++i) {
        if (mSlots[i].state == FREE) chosen = (int)i;
    }
    if (chosen < 0) {
        // No free slot: the oldest frame the consumer has not taken is dropped
        // rather than blocking the producer.
        uint64_t oldest = UINT64_MAX;
        for (size_t i = 0; i < mSlots.size(); ++i) {
            if (mSlots[i].state == QUEUED && mSlots[i].frameNumber < oldest) {
                oldest = mSlots[i].frameNumber;
                chosen = (int)i;
            }
        }
        if (chosen < 0) return -EBUSY;
        ++mDropped;
    }
    uint32_t w = mWidth != 0 ? mWidth : mDefaultWidth;
    uint32_t h = mHeight != 0 ? mHeight : mDefaultHeight;
    PixelFormat f = mFormat != 0 ? mFormat : mDefaultFormat;
    Slot& slot = mSlots[chosen];
    if (slot.buffer == nullptr || slot.buffer->getWidth() != w || slot.buffer->getHeight() != h ||
        slot.buffer->getPixelFormat() != f || slot.buffer->getUsage() != mUsage) {
        sp<GraphicBuffer> fresh = new GraphicBuffer(w, h, f, (uint32_t)mUsage, "HostWindow");
        if (fresh->initCheck() != NO_ERROR) return fresh->initCheck();
        slot.buffer = fresh;
    }
    slot.state = DEQUEUED;
    *buffer = slot.buffer->getNativeBuffer();
    return NO_ERROR;
}

int HostWindow::queue(ANativeWindowBuffer* buffer) {
    std::lock_guard<std::mutex> guard(mLock);
    int index = findSlot_l(buffer);
    if (index < 0 || mSlots[index].state != DEQUEUED) return BAD_VALUE;
    Slot& slot = mSlots[index];
    slot.state = QUEUED;
    slot.frameNumber = ++mFrameCounter;
    slot.timestamp = mNextTimestamp != 0 ? mNextTimestamp : systemTime(SYSTEM_TIME_MONOTONIC);
    mNextTimestamp = 0;
    return NO_ERROR;
}

int HostWindow::cancel(ANativeWindowBuffer* buffer) {
    std::lock_guard<std::mutex> guard(mLock);
    int index = findSlot_l(buffer);
    if (index < 0 || mSlots[index].state != DEQUEUED) return BAD_VALUE;
    mSlots[index].state = FREE;
    return NO_ERROR;
}

int HostWindow::queryValue(int what, int* value) {
    if (value == nullptr) return BAD_VALUE;
    std::lock_guard<std::mutex> guard(mLock);
    switch (what) {
        case NATIVE_WINDOW_WIDTH:
            *value = (int)(mWidth != 0 ? mWidth : mDefaultWidth);
            break;
        case NATIVE_WINDOW_HEIGHT:
            *value = (int)(mHeight != 0 ? mHeight : mDefaultHeight);
            break;
        case NATIVE_WINDOW_FORMAT:
            *value = mFormat != 0 ? mFormat : mDefaultFormat;
            break;
        case NATIVE_WINDOW_DEFAULT_WIDTH:
            *value = (int)mDefaultWidth;
            break;
        case NATIVE_WINDOW_DEFAULT_HEIGHT:
            *value = (int)mDefaultHeight;
            break;
        case NATIVE_WINDOW_MIN_UNDEQUEUED_BUFFERS:
            *value = 1;
            break;
        case NATIVE_WINDOW_QUEUES_TO_WINDOW_COMPOSER:
            *value = 0;
            break;
        case NATIVE_WINDOW_CONCRETE_TYPE:
            *value = NATIVE_WINDOW_SURFACE;
            break;
        case NATIVE_WINDOW_TRANSFORM_HINT:
            *value = 0;
            break;
        case NATIVE_WINDOW_CONSUMER_RUNNING_BEHIND:
            *value = 0;
            break;
        default:
            return BAD_VALUE;
    }
    return NO_ERROR;
}

int HostWindow::performOperation(int operation, va_list args) {
    std::lock_guard<std::mutex> guard(mLock);
    switch (operation) {
        case NATIVE_WINDOW_SET_USAGE:
            mUsage = (uint32_t)va_arg(args, int);
            return NO_ERROR;
        case NATIVE_WINDOW_SET_BUFFER_COUNT: {
            int count = va_arg(args, int);
            if (count < 0 || count > kMaxBufferCount) return BAD_VALUE;
            for (const Slot& slot : mSlots) {
                if (slot.state == DEQUEUED || slot.state == ACQUIRED) return INVALID_OPERATION;
            }
            mSlots.clear();  // also forgets queued frames, as a reconfigured queue does
            mSlots.resize(count == 0 ? kDefaultBufferCount : count);
            return NO_ERROR;
        }
        case NATIVE_WINDOW_SET_BUFFERS_GEOMETRY: {
            int w = va_arg(args, int);
            int h = va_arg(args, int);
            int f = va_arg(args, int);
            if (w < 0 || h < 0 || (w == 0) != (h == 0)) return BAD_VALUE;
            mWidth = (uint32_t)w;
            mHeight = (uint32_t)h;
            mFormat = f;
            return NO_ERROR;
        }
        case NATIVE_WINDOW_SET_BUFFERS_DIMENSIONS: {
            int w = va_arg(args, int);
            int h = va_arg(args, int);
            if (w < 0 || h < 0 || (w == 0) != (h == 0)) return BAD_VALUE;
            mWidth = (uint32_t)w;
            mHeight = (uint32_t)h;
            return NO_ERROR;
        }
        case NATIVE_WINDOW_SET_BUFFERS_FORMAT:
            mFormat = va_arg(args, int);
            return NO_ERROR;
        case NATIVE_WINDOW_SET_BUFFERS_TIMESTAMP:
            mNextTimestamp = va_arg(args, int64_t);
            return NO_ERROR;
        case NATIVE_WINDOW_API_CONNECT: {
            int api = va_arg(args, int);
            if (mConnectedApi != 0) return BAD_VALUE;
            mConnectedApi = api;
            return NO_ERROR;
        }
        case NATIVE_WINDOW_API_DISCONNECT: {
            int api = va_arg(args, int);
            if (mConnectedApi != api) return BAD_VALUE;
            mConnectedApi = 0;
            return NO_ERROR;
        }
        case NATIVE_WINDOW_CONNECT:
        case NATIVE_WINDOW_DISCONNECT:
        case NATIVE_WINDOW_SET_CROP:
        case NATIVE_WINDOW_SET_BUFFERS_TRANSFORM:
        case NATIVE_WINDOW_SET_SCALING_MODE:
            return NO_ERROR;
        default:
            return INVALID_OPERATION;
    }
}

status_t HostWindow::acquireFrame(sp<GraphicBuffer>* buffer, uint64_t* frameNumber,
                                  int64_t* timestamp) {
    if (buffer == nullptr) return BAD_VALUE;
    std::lock_guard<std::mutex> guard(mLock);
    int oldest = -1;
    for (size_t i = 0; i < mSlots.size(); ++i) {
        if (mSlots[i].state == QUEUED &&
            (oldest < 0 || mSlots[i].frameNumber < mSlots[oldest].frameNumber)) {
            oldest = (int)i;
        }
    }
    if (oldest < 0) return WOULD_BLOCK;
    mSlots[oldest].state = ACQUIRED;
    *buffer = mSlots[oldest].buffer;
    if (frameNumber != nullptr) *frameNumber = mSlots[oldest].frameNumber;
    if (timestamp != nullptr) *timestamp = mSlots[oldest].timestamp;
    return NO_ERROR;
}

status_t HostWindow::releaseFrame(const sp<GraphicBuffer>& buffer) {
    if (buffer == nullptr) return BAD_VALUE;
    std::lock_guard<std::mutex> guard(mLock);
    int index = findSlot_l(buffer->getNativeBuffer());
    if (index < 0 || mSlots[index].state != ACQUIRED) return BAD_VALUE;
    mSlots[index].state = FREE;
    return NO_ERROR;
}

size_t HostWindow::queuedFrameCount() {
    std::lock_guard<std::mutex> guard(mLock);
    size_t count = 0;
    for (const Slot& slot : mSlots) count += slot.state == QUEUED ? 1 : 0;
    return count;
}

uint64_t HostWindow::queuedTotal() {
    std::lock_guard<std::mutex> guard(mLock);
    return mFrameCounter;
}

uint64_t HostWindow::droppedTotal() {
    std::lock_guard<std::mutex> guard(mLock);
    return mDropped;
}

int HostWindow::getBufferCount() {
    std::lock_guard<std::mutex> guard(mLock);
    return (int)mSlots.size();
}

uint64_t HostWindow::getConsumerUsage() {
    std::lock_guard<std::mutex> guard(mLock);
    return mUsage;
}

int HostWindow::getConnectedApi() {
    std::lock_guard<std::mutex> guard(mLock);
    return mConnectedApi;
}

}  // namespace android
