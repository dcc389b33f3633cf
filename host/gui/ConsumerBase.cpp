#include <gui/ConsumerBase.h>

namespace android {

ConsumerBase::ConsumerBase(const sp<IGraphicBufferConsumer>& consumer, bool controlledByApp)
    : mAbandoned(consumer == nullptr), mConsumer(consumer), mControlledByApp(controlledByApp) {}

ConsumerBase::~ConsumerBase() {}

void ConsumerBase::onFirstRef() {
    // The queue holds its listener by weak reference: taken once a strong
    // one exists, so the callbacks can promote it.
    if (mConsumer != nullptr) {
        mConsumer->consumerConnect(static_cast<IConsumerListener*>(this), mControlledByApp);
    }
}

void ConsumerBase::onLastStrongRef(const void* id) {
    RefBase::onLastStrongRef(id);
    abandon();
}

void ConsumerBase::abandon() {
    Mutex::Autolock lock(mMutex);
    if (mAbandoned) return;
    abandonLocked();
    mAbandoned = true;
}

void ConsumerBase::abandonLocked() {
    mConsumer->consumerDisconnect();
    // Read once the queue refuses frames, so no frame queued meanwhile is
    // missing from the final count.
    mFinalStats = mConsumer->getQueueStats();
    mConsumer.clear();
}

bool ConsumerBase::isAbandoned() {
    Mutex::Autolock lock(mMutex);
    return mAbandoned;
}

void ConsumerBase::setName(const String8& name) {
    Mutex::Autolock lock(mMutex);
    if (!mAbandoned) mConsumer->setConsumerName(name);
}

void ConsumerBase::setFrameAvailableListener(const wp<FrameAvailableListener>& listener) {
    Mutex::Autolock lock(mListenerMutex);
    mFrameAvailableListener = listener;
}

status_t ConsumerBase::setDefaultBufferSize(uint32_t width, uint32_t height) {
    Mutex::Autolock lock(mMutex);
    return mAbandoned ? NO_INIT : mConsumer->setDefaultBufferSize(width, height);
}

status_t ConsumerBase::setDefaultBufferFormat(PixelFormat format) {
    Mutex::Autolock lock(mMutex);
    return mAbandoned ? NO_INIT : mConsumer->setDefaultBufferFormat(format);
}

status_t ConsumerBase::setConsumerUsageBits(uint64_t usage) {
    Mutex::Autolock lock(mMutex);
    return mAbandoned ? NO_INIT : mConsumer->setConsumerUsageBits(usage);
}

IGraphicBufferConsumer::QueueStats ConsumerBase::getQueueStats() {
    Mutex::Autolock lock(mMutex);
    return mAbandoned ? mFinalStats : mConsumer->getQueueStats();
}

void ConsumerBase::onFrameAvailable(const BufferItem& item) {
    sp<FrameAvailableListener> listener;
    {
        Mutex::Autolock lock(mListenerMutex);
        listener = mFrameAvailableListener.promote();
    }
    if (listener != nullptr) listener->onFrameAvailable(item);
}

void ConsumerBase::onFrameReplaced(const BufferItem& item) {
    sp<FrameAvailableListener> listener;
    {
        Mutex::Autolock lock(mListenerMutex);
        listener = mFrameAvailableListener.promote();
    }
    if (listener != nullptr) listener->onFrameReplaced(item);
}

}  // namespace android
