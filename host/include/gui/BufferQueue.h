// A buffer queue on a host: a FIFO of a few GraphicBuffer slots between one
// producer and one consumer, as on a device where the library depends on it
// (slot states, frame numbers, transforms and timestamps, frame-available
// callbacks on the producer's thread, blocking or non-blocking dequeue, the
// consumer's release fences, NO_INIT to the producer once abandoned). A
// frame's acquire fence travels in its buffer, not in the queue (see
// IGraphicBufferProducer.h). Not modelled: binder, buffer sharing across
// processes, timed presentation, shared-buffer mode.
#ifndef KIV_HOST_GUI_BUFFERQUEUE_H
#define KIV_HOST_GUI_BUFFERQUEUE_H

#include <gui/IGraphicBufferConsumer.h>
#include <gui/IGraphicBufferProducer.h>

namespace android {

class BufferQueue {
public:
    // Slots a queue can have; it starts with kDefaultBufferCount.
    enum { NUM_BUFFER_SLOTS = 8 };
    static const int kDefaultBufferCount = 3;

    static void createBufferQueue(sp<IGraphicBufferProducer>* outProducer,
                                  sp<IGraphicBufferConsumer>* outConsumer,
                                  bool consumerIsSurfaceFlinger = false);
};

}  // namespace android

#endif
