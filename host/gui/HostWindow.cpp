#include <gui/HostWindow.h>

#include <string.h>

namespace android {

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

HostWindow::HostWindow(const Queue& queue) : Surface(queue.producer), mConsumer(queue.consumer) {
    setDefaultUsage(GraphicBuffer::USAGE_HW_RENDER | GraphicBuffer::USAGE_HW_TEXTURE |
                    GraphicBuffer::USAGE_SW_READ_OFTEN);
}

HostWindow::~HostWindow() {
    mConsumer->abandon();
}

status_t HostWindow::acquireFrame(sp<GraphicBuffer>* buffer, uint64_t* frameNumber,
                                  int64_t* timestamp) {
    if (buffer == nullptr) return BAD_VALUE;
    BufferItem item;
    status_t status = mConsumer->acquireBuffer(&item, 0);
    if (status == IGraphicBufferConsumer::NO_BUFFER_AVAILABLE) return WOULD_BLOCK;
    if (status != NO_ERROR) return status;
    *buffer = item.mGraphicBuffer;
    if (frameNumber != nullptr) *frameNumber = item.mFrameNumber;
    if (timestamp != nullptr) *timestamp = item.mTimestamp;
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
