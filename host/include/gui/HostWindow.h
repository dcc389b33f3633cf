// A window that receives frames on a host: the producer side is a plain
// ANativeWindow (dequeue, queue, cancel, query, perform) over a few
// GraphicBuffer slots; the consumer side takes the queued frames in order.
// It stands where a device has a Surface on a BufferQueue, for code that
// only needs a window to render into.
#ifndef KIV_HOST_GUI_HOSTWINDOW_H
#define KIV_HOST_GUI_HOSTWINDOW_H

#include <stdint.h>

#include <mutex>
#include <vector>

#include <system/window.h>
#include <ui/GraphicBuffer.h>
#include <utils/RefBase.h>
#include <utils/StrongPointer.h>

namespace android {

class HostWindow : public ANativeWindow, public RefBase {
public:
    static const int kDefaultBufferCount = 3;
    static const int kMaxBufferCount = 8;

    // Default buffer size and format; usage starts as GPU rendering plus
    // software reads, what an EGL window needs.
    HostWindow(uint32_t width, uint32_t height, PixelFormat format = HAL_PIXEL_FORMAT_RGBA_8888);

    // Consumer side. The oldest queued frame, or WOULD_BLOCK when none is
    // queued. The slot stays with the consumer until releaseFrame().
    status_t acquireFrame(sp<GraphicBuffer>* buffer, uint64_t* frameNumber, int64_t* timestamp);
    status_t releaseFrame(const sp<GraphicBuffer>& buffer);

    size_t queuedFrameCount();
    // Frames queued since creation, and frames dropped because the producer
    // needed their slot before the consumer took them.
    uint64_t queuedTotal();
    uint64_t droppedTotal();
    int getBufferCount();
    uint64_t getConsumerUsage();
    int getConnectedApi();

    void incStrong(const void* id) const { RefBase::incStrong(id); }
    void decStrong(const void* id) const { RefBase::decStrong(id); }

    HostWindow(const HostWindow&) = delete;
    HostWindow& operator=(const HostWindow&) = delete;

protected:
    ~HostWindow() override;

private:
    enum SlotState { FREE, DEQUEUED, QUEUED, ACQUIRED };
    struct Slot {
        sp<GraphicBuffer> buffer;
        SlotState state = FREE;
        uint64_t frameNumber = 0;
        int64_t timestamp = 0;
    };

    int dequeue(ANativeWindowBuffer** buffer);
    int queue(ANativeWindowBuffer* buffer);
    int cancel(ANativeWindowBuffer* buffer);
    int queryValue(int what, int* value);
    int performOperation(int operation, va_list args);
    int findSlot_l(ANativeWindowBuffer* buffer);

    static void hookIncRef(android_native_base_t* base);
    static void hookDecRef(android_native_base_t* base);
    static int hookSetSwapInterval(ANativeWindow* window, int interval);
    static int hookDequeueBuffer(ANativeWindow* window, ANativeWindowBuffer** buffer, int* fenceFd);
    static int hookQueueBuffer(ANativeWindow* window, ANativeWindowBuffer* buffer, int fenceFd);
    static int hookCancelBuffer(ANativeWindow* window, ANativeWindowBuffer* buffer, int fenceFd);
    static int hookQuery(const ANativeWindow* window, int what, int* value);
    static int hookPerform(ANativeWindow* window, int operation, ...);
    static HostWindow* self(ANativeWindow* window);

    std::mutex mLock;
    uint32_t mDefaultWidth;
    uint32_t mDefaultHeight;
    PixelFormat mDefaultFormat;
    uint32_t mWidth;      // 0: the default
    uint32_t mHeight;     // 0: the default
    PixelFormat mFormat;  // 0: the default
    uint64_t mUsage;
    int mConnectedApi;
    int64_t mNextTimestamp;
    std::vector<Slot> mSlots;
    uint64_t mFrameCounter;
    uint64_t mDropped;
};

}  // namespace android

#endif
