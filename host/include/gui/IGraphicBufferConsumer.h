// The consumer end of a buffer queue, usable without GL: acquire the oldest
// queued frame, release it (with an optional EGL fence the producer waits
// for before it writes the buffer again), or abandon the queue.
#ifndef KIV_HOST_GUI_IGRAPHICBUFFERCONSUMER_H
#define KIV_HOST_GUI_IGRAPHICBUFFERCONSUMER_H

#include <stdint.h>

#include <EGL/egl.h>
#include <EGL/eglext.h>
#include <gui/BufferItem.h>
#include <gui/IConsumerListener.h>
#include <ui/PixelFormat.h>
#include <utils/Errors.h>
#include <utils/RefBase.h>
#include <utils/String8.h>
#include <utils/Timers.h>

namespace android {

class IGraphicBufferConsumer : public virtual RefBase {
public:
    enum {
        // releaseBuffer(): the slot's buffer is no longer the one acquired.
        STALE_BUFFER_SLOT = 1,
        // acquireBuffer(): nothing is queued.
        NO_BUFFER_AVAILABLE,
        PRESENT_LATER,
    };

    // Host only: what the queue has seen.
    struct QueueStats {
        uint64_t queued = 0;   // frames queued since creation
        uint64_t dropped = 0;  // queued frames replaced before the consumer took them
        size_t pending = 0;    // frames queued and not acquired yet
        int bufferCount = 0;   // slots in use
    };

    // The oldest queued frame (presentWhen is not modelled: no frame is held
    // back for its timestamp). NO_BUFFER_AVAILABLE, INVALID_OPERATION when
    // too many are acquired, NO_INIT once abandoned.
    virtual status_t acquireBuffer(BufferItem* item, nsecs_t presentWhen) = 0;
    // Gives an acquired frame back; `fence` (EGL_NO_SYNC_KHR for none) is an
    // EGL fence on `display` that the queue waits for, and destroys, before
    // the producer gets the buffer again.
    virtual status_t releaseBuffer(int slot, uint64_t frameNumber, EGLDisplay display,
                                   EGLSyncKHR fence) = 0;
    // The listener is held by weak reference.
    virtual status_t consumerConnect(const sp<IConsumerListener>& listener,
                                     bool controlledByApp) = 0;
    // Abandons the queue: buffers are let go and every producer call but
    // disconnect fails with NO_INIT from now on.
    virtual status_t consumerDisconnect() = 0;
    virtual status_t setDefaultBufferSize(uint32_t width, uint32_t height) = 0;
    virtual status_t setDefaultBufferFormat(PixelFormat format) = 0;
    virtual status_t setConsumerUsageBits(uint64_t usage) = 0;
    // Frames the consumer may hold at once, beyond the one it always may.
    virtual status_t setMaxAcquiredBufferCount(int count) = 0;
    virtual status_t setConsumerName(const String8& name) = 0;
    virtual QueueStats getQueueStats() = 0;
};

}  // namespace android

#endif
