// A window whose frames the host program takes itself: a Surface on a buffer
// queue of its own with a CPU consumer, for code that only needs a window to
// render into (the preview window of a host pipeline, tests). The queue is in
// async mode, as a display is: a producer never waits, and a frame nobody
// took makes room for the next when every slot is busy.
//
// Like a display, the window also notes when each frame could first be
// shown: a frame queued while its draw is still in flight (a host EGL
// swap's) is ready when the draw's fence signals, which a thread of the
// window waits for as it comes; any other frame is ready when queued.
#ifndef KIV_HOST_GUI_HOSTWINDOW_H
#define KIV_HOST_GUI_HOSTWINDOW_H

#include <stdint.h>

#include <memory>
#include <mutex>
#include <vector>

#include <gui/BufferItemConsumer.h>
#include <gui/Surface.h>

namespace android {

class HostWindow : public Surface {
public:
    static const int kDefaultBufferCount = BufferQueue::kDefaultBufferCount;
    static const int kMaxBufferCount = BufferQueue::NUM_BUFFER_SLOTS;

    // Default buffer size and format; usage starts as GPU rendering plus
    // software reads, what an EGL window needs.
    HostWindow(uint32_t width, uint32_t height, PixelFormat format = HAL_PIXEL_FORMAT_RGBA_8888);

    // Consumer side. The oldest queued frame, or WOULD_BLOCK when none is
    // queued. The slot stays with the consumer until releaseFrame(). With
    // `readyTime`, also the time (systemTime(SYSTEM_TIME_MONOTONIC), as the
    // queue's timestamps) at which its pixels were there, once they are.
    status_t acquireFrame(sp<GraphicBuffer>* buffer, uint64_t* frameNumber, int64_t* timestamp,
                          int64_t* readyTime = nullptr);
    status_t releaseFrame(const sp<GraphicBuffer>& buffer);

    // The newest queued frame, RGBA rows top first, with the older ones
    // released unread; empty when none is queued or it cannot be read.
    std::vector<uint8_t> latestFrame();

    // The consumer goes away, as a display that dropped the window: the
    // producer gets NO_INIT from then on.
    void abandon();

    size_t queuedFrameCount();
    // Frames queued since creation, and frames dropped because the producer
    // needed their slot before the consumer took them.
    uint64_t queuedTotal();
    uint64_t droppedTotal();
    int getBufferCount();
    // The usage the window's buffers are allocated with.
    uint64_t getConsumerUsage();

protected:
    ~HostWindow() override;

private:
    struct Queue {
        sp<IGraphicBufferProducer> producer;
        sp<BufferItemConsumer> consumer;
    };
    static Queue makeQueue(uint32_t width, uint32_t height, PixelFormat format);
    explicit HostWindow(const Queue& queue);

    struct Readiness;
    class FrameWatch;

    const sp<BufferItemConsumer> mConsumer;
    std::mutex mLock;
    std::vector<BufferItem> mAcquired;
    const std::shared_ptr<Readiness> mReadiness;
    const sp<FrameWatch> mWatch;  // the queue holds it weakly
};

}  // namespace android

#endif
