// Common base of the consumers of a buffer queue: connects to the queue as
// its listener, passes frame-available callbacks on to a listener held by
// weak reference, and abandons the queue when abandon() is called or the
// last strong reference goes (so that the producer gets NO_INIT).
#ifndef KIV_HOST_GUI_CONSUMERBASE_H
#define KIV_HOST_GUI_CONSUMERBASE_H

#include <gui/IGraphicBufferConsumer.h>
#include <utils/Mutex.h>
#include <utils/RefBase.h>
#include <utils/String8.h>

namespace android {

class ConsumerBase : public virtual RefBase, protected IConsumerListener {
public:
    struct FrameAvailableListener : public virtual RefBase {
        virtual void onFrameAvailable(const BufferItem& item) = 0;
        virtual void onFrameReplaced(const BufferItem& /*item*/) {}
    };

    ~ConsumerBase() override;

    void abandon();
    bool isAbandoned();
    void setName(const String8& name);
    void setFrameAvailableListener(const wp<FrameAvailableListener>& listener);
    status_t setDefaultBufferSize(uint32_t width, uint32_t height);
    status_t setDefaultBufferFormat(PixelFormat format);
    status_t setConsumerUsageBits(uint64_t usage);
    // Host only: what the queue has seen (once abandoned, what it had seen then).
    IGraphicBufferConsumer::QueueStats getQueueStats();

protected:
    ConsumerBase(const sp<IGraphicBufferConsumer>& consumer, bool controlledByApp);

    void onFirstRef() override;
    void onLastStrongRef(const void* id) override;
    // With mMutex held: subclasses let go of what they hold of the queue.
    virtual void abandonLocked();

    void onFrameAvailable(const BufferItem& item) override;
    void onFrameReplaced(const BufferItem& item) override;

    Mutex mMutex;
    bool mAbandoned;
    sp<IGraphicBufferConsumer> mConsumer;

private:
    // What the queue had counted when it was abandoned (kept from then on).
    IGraphicBufferConsumer::QueueStats mFinalStats;
    const bool mControlledByApp;
    Mutex mListenerMutex;
    wp<FrameAvailableListener> mFrameAvailableListener;
};

}  // namespace android

#endif
