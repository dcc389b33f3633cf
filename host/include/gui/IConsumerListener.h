// What a buffer queue tells its consumer, on the thread of the producer call
// that caused it.
#ifndef KIV_HOST_GUI_ICONSUMERLISTENER_H
#define KIV_HOST_GUI_ICONSUMERLISTENER_H

#include <gui/BufferItem.h>
#include <utils/RefBase.h>

namespace android {

class ConsumerListener : public virtual RefBase {
public:
    // A frame was queued (in queue order; calls never overlap).
    virtual void onFrameAvailable(const BufferItem& item) = 0;
    // A queued frame was replaced before the consumer took it.
    virtual void onFrameReplaced(const BufferItem& /*item*/) {}
    // The queue let go of its buffers (reconfigured or abandoned).
    virtual void onBuffersReleased() {}
};

class IConsumerListener : public ConsumerListener {};

}  // namespace android

#endif
