#include <gui/BufferItemConsumer.h>

namespace android {

BufferItemConsumer::BufferItemConsumer(const sp<IGraphicBufferConsumer>& consumer,
                                       uint64_t consumerUsage, int bufferCount,
                                       bool controlledByApp)
    : ConsumerBase(consumer, controlledByApp) {
    if (consumer == nullptr) return;
    consumer->setConsumerUsageBits(consumerUsage);
    if (bufferCount > 0) consumer->setMaxAcquiredBufferCount(bufferCount);
}

status_t BufferItemConsumer::acquireBuffer(BufferItem* item, nsecs_t presentWhen, bool) {
    if (item == nullptr) return BAD_VALUE;
    Mutex::Autolock lock(mMutex);
    if (mAbandoned) return NO_INIT;
    return mConsumer->acquireBuffer(item, presentWhen);
}

status_t BufferItemConsumer::releaseBuffer(const BufferItem& item) {
    Mutex::Autolock lock(mMutex);
    if (mAbandoned) return NO_INIT;
    return mConsumer->releaseBuffer(item.mSlot, item.mFrameNumber, EGL_NO_DISPLAY, EGL_NO_SYNC_KHR);
}

}  // namespace android
