// A consumer that takes frames on the CPU (or hands them to anything that is
// not a GL texture, such as a video encoder): acquire the oldest queued
// frame, use its buffer, release it.
#ifndef KIV_HOST_GUI_BUFFERITEMCONSUMER_H
#define KIV_HOST_GUI_BUFFERITEMCONSUMER_H

#include <gui/ConsumerBase.h>

namespace android {

class BufferItemConsumer : public ConsumerBase {
public:
    // `consumerUsage` is added to every buffer's usage; `bufferCount` > 0
    // sets the frames the consumer may hold at once.
    BufferItemConsumer(const sp<IGraphicBufferConsumer>& consumer, uint64_t consumerUsage,
                       int bufferCount = -1, bool controlledByApp = false);

    // NO_BUFFER_AVAILABLE when nothing is queued. No fences on a host.
    status_t acquireBuffer(BufferItem* item, nsecs_t presentWhen, bool waitForFence = true);
    status_t releaseBuffer(const BufferItem& item);
};

}  // namespace android

#endif
