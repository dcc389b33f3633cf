#include <gui/Surface.h>

#include <utils/Timers.h>

namespace android {

Surface::Surface(const sp<IGraphicBufferProducer>& producer, bool controlledByApp)
    : mProducer(producer), mControlledByApp(controlledByApp) {
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

Surface::~Surface() {
    if (mConnectedApi != 0 && mProducer != nullptr) mProducer->disconnect(mConnectedApi);
}

int Surface::getConnectedApi() {
    Mutex::Autolock lock(mMutex);
    return mConnectedApi;
}

uint64_t Surface::getRequestedUsage() {
    Mutex::Autolock lock(mMutex);
    return mReqUsage;
}

void Surface::hookIncRef(android_native_base_t* base) {
    Surface* self = static_cast<Surface*>(reinterpret_cast<ANativeWindow*>(base));
    self->incStrong(self);
}

void Surface::hookDecRef(android_native_base_t* base) {
    Surface* self = static_cast<Surface*>(reinterpret_cast<ANativeWindow*>(base));
    self->decStrong(self);
}

int Surface::hookSetSwapInterval(ANativeWindow*, int) {
    return NO_ERROR;
}

int Surface::hookDequeueBuffer(ANativeWindow* window, ANativeWindowBuffer** buffer, int* fenceFd) {
    if (fenceFd != nullptr) *fenceFd = -1;
    return static_cast<Surface*>(window)->dequeue(buffer);
}

int Surface::hookQueueBuffer(ANativeWindow* window, ANativeWindowBuffer* buffer, int) {
    return static_cast<Surface*>(window)->queue(buffer);
}

int Surface::hookCancelBuffer(ANativeWindow* window, ANativeWindowBuffer* buffer, int) {
    return static_cast<Surface*>(window)->cancel(buffer);
}

int Surface::hookQuery(const ANativeWindow* window, int what, int* value) {
    return static_cast<Surface*>(const_cast<ANativeWindow*>(window))->queryValue(what, value);
}

int Surface::hookPerform(ANativeWindow* window, int operation, ...) {
    va_list args;
    va_start(args, operation);
    int result = static_cast<Surface*>(window)->performOperation(operation, args);
    va_end(args);
    return result;
}

int Surface::slotOf_l(ANativeWindowBuffer* buffer) const {
    for (int i = 0; i < BufferQueue::NUM_BUFFER_SLOTS; ++i) {
        if (buffer != nullptr && mSlots[i] != nullptr && mSlots[i]->getNativeBuffer() == buffer) {
            return i;
        }
    }
    return -1;
}

int Surface::dequeue(ANativeWindowBuffer** buffer) {
    if (buffer == nullptr) return BAD_VALUE;
    uint32_t w, h;
    PixelFormat f;
    uint64_t usage;
    {
        Mutex::Autolock lock(mMutex);
        w = mReqWidth;
        h = mReqHeight;
        f = mReqFormat;
        usage = mReqUsage;
    }
    // Not under the window's lock: the queue may block until a slot frees.
    int slot = -1;
    status_t result = mProducer->dequeueBuffer(&slot, w, h, f, usage);
    Mutex::Autolock lock(mMutex);
    if (result == NO_INIT) {
        for (sp<GraphicBuffer>& cached : mSlots) cached.clear();  // the queue let them go
    }
    if (result < 0) return result;
    sp<GraphicBuffer>& cached = mSlots[slot];
    if ((result & IGraphicBufferProducer::BUFFER_NEEDS_REALLOCATION) != 0 || cached == nullptr) {
        status_t status = mProducer->requestBuffer(slot, &cached);
        if (status != NO_ERROR) {
            mProducer->cancelBuffer(slot);
            return status;
        }
    }
    *buffer = cached->getNativeBuffer();
    return NO_ERROR;
}

int Surface::queue(ANativeWindowBuffer* buffer) {
    Mutex::Autolock lock(mMutex);
    const int slot = slotOf_l(buffer);
    if (slot < 0) return BAD_VALUE;
    IGraphicBufferProducer::QueueBufferInput input;
    input.isAutoTimestamp = mTimestamp == NATIVE_WINDOW_TIMESTAMP_AUTO;
    input.timestamp = input.isAutoTimestamp ? systemTime(SYSTEM_TIME_MONOTONIC) : mTimestamp;
    input.transform = mTransform ^ mStickyTransform;
    input.stickyTransform = mStickyTransform;
    input.scalingMode = mScalingMode;
    IGraphicBufferProducer::QueueBufferOutput output;
    status_t status = mProducer->queueBuffer(slot, input, &output);
    // A timestamp is for one buffer only.
    if (status == NO_ERROR) mTimestamp = NATIVE_WINDOW_TIMESTAMP_AUTO;
    return status;
}

int Surface::cancel(ANativeWindowBuffer* buffer) {
    Mutex::Autolock lock(mMutex);
    const int slot = slotOf_l(buffer);
    return slot < 0 ? BAD_VALUE : mProducer->cancelBuffer(slot);
}

int Surface::queryValue(int what, int* value) {
    if (value == nullptr) return BAD_VALUE;
    {
        Mutex::Autolock lock(mMutex);
        switch (what) {
            case NATIVE_WINDOW_WIDTH:
                if (mReqWidth == 0) break;
                *value = (int)mReqWidth;
                return NO_ERROR;
            case NATIVE_WINDOW_HEIGHT:
                if (mReqHeight == 0) break;
                *value = (int)mReqHeight;
                return NO_ERROR;
            case NATIVE_WINDOW_FORMAT:
                if (mReqFormat == 0) break;
                *value = mReqFormat;
                return NO_ERROR;
            default:
                break;
        }
    }
    return mProducer->query(what, value);
}

int Surface::performOperation(int operation, va_list args) {
    Mutex::Autolock lock(mMutex);
    switch (operation) {
        case NATIVE_WINDOW_SET_USAGE:
            mReqUsage = (uint32_t)va_arg(args, int);
            return NO_ERROR;
        case NATIVE_WINDOW_SET_BUFFER_COUNT: {
            status_t status = mProducer->setBufferCount(va_arg(args, int));
            if (status == NO_ERROR) {
                for (sp<GraphicBuffer>& slot : mSlots) slot.clear();
            }
            return status;
        }
        case NATIVE_WINDOW_SET_BUFFERS_GEOMETRY:
        case NATIVE_WINDOW_SET_BUFFERS_DIMENSIONS:
        case NATIVE_WINDOW_SET_BUFFERS_USER_DIMENSIONS: {
            const int w = va_arg(args, int);
            const int h = va_arg(args, int);
            if (w < 0 || h < 0 || (w == 0) != (h == 0)) return BAD_VALUE;
            mReqWidth = (uint32_t)w;
            mReqHeight = (uint32_t)h;
            if (operation == NATIVE_WINDOW_SET_BUFFERS_GEOMETRY) mReqFormat = va_arg(args, int);
            return NO_ERROR;
        }
        case NATIVE_WINDOW_SET_BUFFERS_FORMAT:
            mReqFormat = va_arg(args, int);
            return NO_ERROR;
        case NATIVE_WINDOW_SET_BUFFERS_TRANSFORM:
            mTransform = (uint32_t)va_arg(args, int);
            return NO_ERROR;
        case NATIVE_WINDOW_SET_BUFFERS_STICKY_TRANSFORM:
            mStickyTransform = (uint32_t)va_arg(args, int);
            return NO_ERROR;
        case NATIVE_WINDOW_SET_BUFFERS_TIMESTAMP:
            mTimestamp = va_arg(args, int64_t);
            return NO_ERROR;
        case NATIVE_WINDOW_SET_DEQUEUE_TIMEOUT:
            return mProducer->setDequeueTimeout(va_arg(args, int64_t));
        case NATIVE_WINDOW_SET_SCALING_MODE: {
            const int mode = va_arg(args, int);
            if (mode < NATIVE_WINDOW_SCALING_MODE_FREEZE ||
                mode > NATIVE_WINDOW_SCALING_MODE_SCALE_CROP) {
                return BAD_VALUE;
            }
            mScalingMode = mode;
            return NO_ERROR;
        }
        case NATIVE_WINDOW_API_CONNECT: {
            const int api = va_arg(args, int);
            IGraphicBufferProducer::QueueBufferOutput output;
            status_t status = mProducer->connect(api, mControlledByApp, &output);
            if (status == NO_ERROR) mConnectedApi = api;
            return status;
        }
        case NATIVE_WINDOW_API_DISCONNECT: {
            const int api = va_arg(args, int);
            status_t status = mProducer->disconnect(api);
            // The geometry and usage stay for the next producer.
            if (status == NO_ERROR) {
                mConnectedApi = 0;
                for (sp<GraphicBuffer>& cached : mSlots) cached.clear();
            }
            return status;
        }
        // Crops, legacy connections and post-transform crops: accepted, not modelled.
        case NATIVE_WINDOW_CONNECT:
        case NATIVE_WINDOW_DISCONNECT:
        case NATIVE_WINDOW_SET_CROP:
        case NATIVE_WINDOW_SET_POST_TRANSFORM_CROP:
            return NO_ERROR;
        default:
            return NAME_NOT_FOUND;
    }
}

}  // namespace android
