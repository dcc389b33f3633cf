// The producer end of a buffer queue (what a Surface stands on). A host has
// no fence file descriptors: a frame still being drawn carries its draw's
// EGL fence in its buffer (GraphicBuffer::setGpuWrite), which the buffer's
// users wait for, and the queue itself waits for the consumer's release
// fence before it hands a buffer out again.
#ifndef KIV_HOST_GUI_IGRAPHICBUFFERPRODUCER_H
#define KIV_HOST_GUI_IGRAPHICBUFFERPRODUCER_H

#include <stdint.h>

#include <ui/GraphicBuffer.h>
#include <ui/PixelFormat.h>
#include <utils/Errors.h>
#include <utils/RefBase.h>
#include <utils/Timers.h>

namespace android {

class IGraphicBufferProducer : public virtual RefBase {
public:
    enum {
        // dequeueBuffer() flags: the slot holds a new buffer (requestBuffer).
        BUFFER_NEEDS_REALLOCATION = 0x1,
        RELEASE_ALL_BUFFERS = 0x2,
    };

    struct QueueBufferInput {
        int64_t timestamp = 0;
        bool isAutoTimestamp = false;
        uint32_t transform = 0;
        uint32_t stickyTransform = 0;
        int scalingMode = 0;
    };
    struct QueueBufferOutput {
        uint32_t width = 0;
        uint32_t height = 0;
        uint32_t transformHint = 0;
        uint32_t numPendingBuffers = 0;
        uint64_t nextFrameNumber = 0;
    };

    // The buffer of a dequeued slot.
    virtual status_t requestBuffer(int slot, sp<GraphicBuffer>* buffer) = 0;
    // A free slot for the producer (0 sizes and format: the consumer's
    // defaults), blocking while none is free unless the queue is in async
    // mode or the dequeue timeout says otherwise. >= 0 (flags above) or
    // NO_INIT (abandoned), WOULD_BLOCK, TIMED_OUT, INVALID_OPERATION (every
    // slot is with the producer already), or an allocation error.
    virtual status_t dequeueBuffer(int* slot, uint32_t width, uint32_t height, PixelFormat format,
                                   uint64_t usage) = 0;
    virtual status_t queueBuffer(int slot, const QueueBufferInput& input,
                                 QueueBufferOutput* output) = 0;
    virtual status_t cancelBuffer(int slot) = 0;
    // NATIVE_WINDOW_* attributes; NO_INIT once the consumer is gone.
    virtual int query(int what, int* value) = 0;
    virtual status_t connect(int api, bool producerControlledByApp, QueueBufferOutput* output) = 0;
    virtual status_t disconnect(int api) = 0;
    // Slots in use, 0 for the default; not while a buffer is dequeued or
    // acquired (INVALID_OPERATION).
    virtual status_t setBufferCount(int bufferCount) = 0;
    // In async mode dequeue never blocks: with no free slot it takes the
    // oldest frame the consumer has not acquired yet (dropping it), or
    // returns WOULD_BLOCK.
    virtual status_t setAsyncMode(bool async) = 0;
    // How long a dequeue may block: < 0 for ever (the default), 0 not at all.
    virtual status_t setDequeueTimeout(nsecs_t timeout) = 0;
};

}  // namespace android

#endif
