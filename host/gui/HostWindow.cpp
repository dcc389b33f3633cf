#include <gui/HostWindow.h>

#include <string.h>

#include <condition_variable>
#include <deque>
#include <map>
#include <thread>

#include <utils/Timers.h>

namespace android {

// Ready times by frame number, and the frames whose draw is still in flight,
// which the window's thread waits for one after the other (they were drawn
// in that order). The thread starts with the first such frame.
struct HostWindow::Readiness {
    std::mutex lock;
    std::condition_variable changed;
    std::deque<std::pair<uint64_t, sp<GraphicBuffer>>> drawing;
    std::map<uint64_t, int64_t> ready;
    bool stopping = false;
    std::thread thread;

    void watch() {
        std::unique_lock<std::mutex> guard(lock);
        for (;;) {
            changed.wait(guard, [&] { return stopping || !drawing.empty(); });
            if (drawing.empty()) return;
            const auto frame = drawing.front();
            guard.unlock();
            frame.second->waitForGpuWrite();
            const int64_t now = systemTime(SYSTEM_TIME_MONOTONIC);
            guard.lock();
            drawing.pop_front();
            ready[frame.first] = now;
            changed.notify_all();
        }
    }

    void stop() {
        {
            std::lock_guard<std::mutex> guard(lock);
            stopping = true;
            changed.notify_all();
        }
        if (thread.joinable()) thread.join();
    }
};

// Called on the producer's thread as each frame is queued.
class HostWindow::FrameWatch : public ConsumerBase::FrameAvailableListener {
public:
    explicit FrameWatch(const std::shared_ptr<Readiness>& readiness) : mReadiness(readiness) {}
    void onFrameAvailable(const BufferItem& item) override {
        Readiness& r = *mReadiness;
        const bool drawing = item.mGraphicBuffer->hasGpuWrite();
        std::lock_guard<std::mutex> guard(r.lock);
        if (r.stopping) return;
        // Frames this far back have left the queue, taken or dropped.
        const uint64_t gone = item.mFrameNumber > (uint64_t)kMaxBufferCount
                                  ? item.mFrameNumber - (uint64_t)kMaxBufferCount
                                  : 0;
        r.ready.erase(r.ready.begin(), r.ready.lower_bound(gone));
        if (!drawing) {
            r.ready[item.mFrameNumber] = item.mTimestamp;
        } else {
            r.drawing.emplace_back(item.mFrameNumber, item.mGraphicBuffer);
            if (!r.thread.joinable()) r.thread = std::thread([&r] { r.watch(); });
        }
        r.changed.notify_all();
    }

private:
    const std::shared_ptr<Readiness> mReadiness;
};

HostWindow::Queue HostWindow::makeQueue(uint32_t width, uint32_t height, PixelFormat format) {
    sp<IGraphicBufferConsumer> consumer;
    Queue queue;
    BufferQueue::createBufferQueue(&queue.producer, &consumer);
    consumer->setDefaultBufferSize(width, height);
    consumer->setDefaultBufferFormat(format);
    // The consumer may hold every slot but one.
    queue.consumer = new BufferItemConsumer(consumer, 0, kDefaultBufferCount - 1);
    queue.producer->setAsyncMode(true);
    return queue;
}

HostWindow::HostWindow(uint32_t width, uint32_t height, PixelFormat format)
    : HostWindow(makeQueue(width, height, format)) {}

HostWindow::HostWindow(const Queue& queue)
    : Surface(queue.producer),
      mConsumer(queue.consumer),
      mReadiness(std::make_shared<Readiness>()),
      mWatch(new FrameWatch(mReadiness)) {
    setDefaultUsage(GraphicBuffer::USAGE_HW_RENDER | GraphicBuffer::USAGE_HW_TEXTURE |
                    GraphicBuffer::USAGE_SW_READ_OFTEN);
    mConsumer->setFrameAvailableListener(mWatch);
}

HostWindow::~HostWindow() {
    mConsumer->abandon();
    mReadiness->stop();
}

status_t HostWindow::acquireFrame(sp<GraphicBuffer>* buffer, uint64_t* frameNumber,
                                  int64_t* timestamp, int64_t* readyTime) {
    if (buffer == nullptr) return BAD_VALUE;
    BufferItem item;
    status_t status = mConsumer->acquireBuffer(&item, 0);
    if (status == IGraphicBufferConsumer::NO_BUFFER_AVAILABLE) return WOULD_BLOCK;
    if (status != NO_ERROR) return status;
    *buffer = item.mGraphicBuffer;
    if (frameNumber != nullptr) *frameNumber = item.mFrameNumber;
    if (timestamp != nullptr) *timestamp = item.mTimestamp;
    {
        // The queue calls the watch for every frame it queues (perhaps just
        // after this took it), so the entry comes; older ones are of frames
        // dropped unread.
        Readiness& r = *mReadiness;
        std::unique_lock<std::mutex> guard(r.lock);
        if (readyTime != nullptr) {
            r.changed.wait(guard, [&] { return r.ready.count(item.mFrameNumber) != 0; });
            *readyTime = r.ready[item.mFrameNumber];
        }
        r.ready.erase(r.ready.begin(), r.ready.upper_bound(item.mFrameNumber));
    }
    std::lock_guard<std::mutex> guard(mLock);
    mAcquired.push_back(item);
    return NO_ERROR;
}

status_t HostWindow::releaseFrame(const sp<GraphicBuffer>& buffer) {
    if (buffer == nullptr) return BAD_VALUE;
    BufferItem item;
    {
        std::lock_guard<std::mutex> guard(mLock);
        auto found = mAcquired.begin();
        while (found != mAcquired.end() && found->mGraphicBuffer != buffer) ++found;
        if (found == mAcquired.end()) return BAD_VALUE;
        item = *found;
        mAcquired.erase(found);
    }
    return mConsumer->releaseBuffer(item);
}

std::vector<uint8_t> HostWindow::latestFrame() {
    sp<GraphicBuffer> frame, next;
    while (acquireFrame(&next, nullptr, nullptr) == NO_ERROR) {
        if (frame != nullptr) releaseFrame(frame);
        frame = next;
    }
    if (frame == nullptr) return {};
    std::vector<uint8_t> rgba((size_t)frame->getWidth() * frame->getHeight() * 4);
    void* address = nullptr;
    if (frame->lock(GraphicBuffer::USAGE_SW_READ_OFTEN, &address) == NO_ERROR) {
        const size_t row = (size_t)frame->getWidth() * 4;
        for (uint32_t y = 0; y < frame->getHeight(); ++y) {
            memcpy(&rgba[y * row], (uint8_t*)address + (size_t)y * frame->getStride() * 4, row);
        }
        frame->unlock();
    } else {
        rgba.clear();
    }
    releaseFrame(frame);
    return rgba;
}

void HostWindow::abandon() {
    mConsumer->abandon();
}

size_t HostWindow::queuedFrameCount() {
    return mConsumer->getQueueStats().pending;
}

uint64_t HostWindow::queuedTotal() {
    return mConsumer->getQueueStats().queued;
}

uint64_t HostWindow::droppedTotal() {
    return mConsumer->getQueueStats().dropped;
}

int HostWindow::getBufferCount() {
    return mConsumer->getQueueStats().bufferCount;
}

uint64_t HostWindow::getConsumerUsage() {
    return getRequestedUsage();
}

}  // namespace android
