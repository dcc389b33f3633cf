// An ANativeWindow over the producer end of a buffer queue: what a camera,
// a CPU producer or an EGL window surface fills. It asks the queue for
// buffers of the geometry, format and usage set with perform(), and queues
// them with their timestamp and transform (the per-buffer one combined with
// the sticky one).
#ifndef KIV_HOST_GUI_SURFACE_H
#define KIV_HOST_GUI_SURFACE_H

#include <stdarg.h>
#include <stdint.h>

#include <gui/BufferQueue.h>
#include <gui/IGraphicBufferProducer.h>
#include <system/window.h>
#include <utils/Mutex.h>
#include <utils/RefBase.h>

namespace android {

class Surface : public ANativeWindow, public RefBase {
public:
    explicit Surface(const sp<IGraphicBufferProducer>& producer, bool controlledByApp = false);

    sp<IGraphicBufferProducer> getIGraphicBufferProducer() const { return mProducer; }
    // The API connected through this window, 0 when none.
    int getConnectedApi();

    // Both bases declare these; sp<Surface> uses RefBase's.
    void incStrong(const void* id) const { RefBase::incStrong(id); }
    void decStrong(const void* id) const { RefBase::decStrong(id); }

    Surface(const Surface&) = delete;
    Surface& operator=(const Surface&) = delete;

protected:
    // Disconnects an API still connected.
    ~Surface() override;

    // The usage asked for when nothing set one (0 on a device).
    void setDefaultUsage(uint64_t usage) { mReqUsage = usage; }
    uint64_t getRequestedUsage();

private:
    int dequeue(ANativeWindowBuffer** buffer);
    int queue(ANativeWindowBuffer* buffer);
    int cancel(ANativeWindowBuffer* buffer);
    int queryValue(int what, int* value);
    int performOperation(int operation, va_list args);
    int slotOf_l(ANativeWindowBuffer* buffer) const;

    static void hookIncRef(android_native_base_t* base);
    static void hookDecRef(android_native_base_t* base);
    static int hookSetSwapInterval(ANativeWindow* window, int interval);
    static int hookDequeueBuffer(ANativeWindow* window, ANativeWindowBuffer** buffer, int* fenceFd);
    static int hookQueueBuffer(ANativeWindow* window, ANativeWindowBuffer* buffer, int fenceFd);
    static int hookCancelBuffer(ANativeWindow* window, ANativeWindowBuffer* buffer, int fenceFd);
    static int hookQuery(const ANativeWindow* window, int what, int* value);
    static int hookPerform(ANativeWindow* window, int operation, ...);

    const sp<IGraphicBufferProducer> mProducer;
    const bool mControlledByApp;
    Mutex mMutex;
    sp<GraphicBuffer> mSlots[BufferQueue::NUM_BUFFER_SLOTS];
    uint32_t mReqWidth = 0;  // 0: the consumer's default
    uint32_t mReqHeight = 0;
    PixelFormat mReqFormat = 0;  // 0: the consumer's default
    uint64_t mReqUsage = 0;
    int64_t mTimestamp = NATIVE_WINDOW_TIMESTAMP_AUTO;  // for the next queued buffer
    uint32_t mTransform = 0;
    uint32_t mStickyTransform = 0;
    int mScalingMode = NATIVE_WINDOW_SCALING_MODE_FREEZE;
    int mConnectedApi = 0;
};

}  // namespace android

#endif
