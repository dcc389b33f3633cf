// The host buffer queue through its Surface and a CPU consumer: FIFO order,
// frame numbers, timestamps and transforms, frame-available callbacks on the
// producer's thread to a weakly held listener, blocking and non-blocking
// dequeue on a test-driven clock, abandonment, and the status of each misuse.
// kiv-test-labels: threads
#include <gui/BufferItemConsumer.h>
#include <gui/BufferQueue.h>
#include <gui/Surface.h>

#include <android/native_window.h>
#include <gtest/gtest.h>

#include <functional>
#include <thread>
#include <vector>

#include "support/log_capture.h"
#include "support/manual_clock.h"

using namespace android;

namespace {

struct Queue {
    sp<IGraphicBufferProducer> producer;
    sp<IGraphicBufferConsumer> raw;
    sp<BufferItemConsumer> consumer;
    sp<Surface> surface;
    Queue(int w = 16, int h = 8) {
        BufferQueue::createBufferQueue(&producer, &raw);
        raw->setDefaultBufferSize(w, h);
        consumer = new BufferItemConsumer(raw, GraphicBuffer::USAGE_SW_READ_OFTEN);
        surface = new Surface(producer);
    }
    ANativeWindow* window() { return surface.get(); }
    // Dequeues and queues one buffer; the dequeue's status when it fails.
    int post(int64_t timestamp = NATIVE_WINDOW_TIMESTAMP_AUTO) {
        ANativeWindowBuffer* b = nullptr;
        int fence = 0;
        int status = window()->dequeueBuffer(window(), &b, &fence);
        if (status != 0) return status;
        if (timestamp != NATIVE_WINDOW_TIMESTAMP_AUTO)
            native_window_set_buffers_timestamp(window(), timestamp);
        return window()->queueBuffer(window(), b, -1);
    }
};

struct Listener : ConsumerBase::FrameAvailableListener {
    std::vector<uint64_t> frames;
    std::vector<std::thread::id> threads;
    void onFrameAvailable(const BufferItem& item) override {
        frames.push_back(item.mFrameNumber);
        threads.push_back(std::this_thread::get_id());
    }
};

TEST(BufferQueueTest, FramesComeOutInOrderWithTheirNumbersTimesAndTransforms) {
    Queue q;
    sp<Listener> listener = new Listener();
    q.consumer->setFrameAvailableListener(listener);
    ASSERT_EQ(native_window_api_connect(q.window(), NATIVE_WINDOW_API_CAMERA), 0);
    ASSERT_EQ(native_window_set_buffers_geometry(q.window(), 32, 24, HAL_PIXEL_FORMAT_YCrCb_420_SP),
              0);
    EXPECT_EQ(ANativeWindow_getWidth(q.window()), 32);
    EXPECT_EQ(ANativeWindow_getFormat(q.window()), HAL_PIXEL_FORMAT_YCrCb_420_SP);
    ASSERT_EQ(
        native_window_set_buffers_sticky_transform(q.window(), NATIVE_WINDOW_TRANSFORM_FLIP_H), 0);
    ASSERT_EQ(native_window_set_buffers_transform(q.window(), NATIVE_WINDOW_TRANSFORM_ROT_90), 0);
    ASSERT_EQ(q.post(111), 0);
    ASSERT_EQ(q.post(), 0);  // stamped by the window
    EXPECT_EQ(listener->frames, (std::vector<uint64_t>{1, 2}));
    EXPECT_EQ(listener->threads[0], std::this_thread::get_id());
    int behind = 0;
    EXPECT_EQ(q.window()->query(q.window(), NATIVE_WINDOW_CONSUMER_RUNNING_BEHIND, &behind), 0);
    EXPECT_EQ(behind, 1);

    BufferItem a, b, none;
    ASSERT_EQ(q.consumer->acquireBuffer(&a, 0), NO_ERROR);
    ASSERT_EQ(q.consumer->acquireBuffer(&b, 0), NO_ERROR);
    EXPECT_EQ(q.consumer->acquireBuffer(&none, 0),
              (status_t)IGraphicBufferConsumer::NO_BUFFER_AVAILABLE);
    EXPECT_EQ(a.mFrameNumber, 1u);
    EXPECT_EQ(a.mTimestamp, 111);
    EXPECT_FALSE(a.mIsAutoTimestamp);
    EXPECT_TRUE(b.mIsAutoTimestamp);
    EXPECT_GT(b.mTimestamp, 0);
    EXPECT_EQ(a.mTransform,
              (uint32_t)(NATIVE_WINDOW_TRANSFORM_ROT_90 ^ NATIVE_WINDOW_TRANSFORM_FLIP_H));
    ASSERT_NE(a.mGraphicBuffer, nullptr);
    EXPECT_EQ(a.mGraphicBuffer->getWidth(), 32u);
    EXPECT_EQ(a.mGraphicBuffer->getPixelFormat(), HAL_PIXEL_FORMAT_YCrCb_420_SP);
    // The consumer's usage is added to the producer's.
    EXPECT_NE(a.mGraphicBuffer->getUsage() & GraphicBuffer::USAGE_SW_READ_OFTEN, 0u);
    EXPECT_EQ(q.consumer->releaseBuffer(a), NO_ERROR);
    EXPECT_EQ(q.consumer->releaseBuffer(b), NO_ERROR);

    // The listener is held weakly: once its owner lets it go, nothing is called.
    listener.clear();
    EXPECT_EQ(q.post(), 0);
    EXPECT_EQ(q.consumer->getQueueStats().queued, 3u);
    // Abandoned: frames are refused and the final count stays (an encoder's
    // statistics read it after closing).
    q.consumer->abandon();
    EXPECT_EQ(q.post(), NO_INIT);
    EXPECT_EQ(q.consumer->getQueueStats().queued, 3u);
}

TEST(BufferQueueTest, DequeueBlocksUntilAReleaseOrItsTimeoutOnTheTestClock) {
    ManualClock clock;
    Queue q;
    ASSERT_EQ(q.post(), 0);
    ASSERT_EQ(q.post(), 0);
    ASSERT_EQ(q.post(), 0);
    BufferItem item;
    ASSERT_EQ(q.consumer->acquireBuffer(&item, 0), NO_ERROR);
    // Every slot is queued or acquired: the next dequeue waits for a release.
    status_t blocked = 1;
    std::thread producer([&] { blocked = q.post(); });
    ASSERT_TRUE(clock.waitForWaiters(1));
    clock.advanceMs(10000);  // no timeout set: time alone does not end it
    EXPECT_EQ(clock.waiters(), 1u);
    ASSERT_EQ(q.consumer->releaseBuffer(item), NO_ERROR);
    producer.join();
    EXPECT_EQ(blocked, 0);

    // With a timeout, it ends when the clock reaches it and not before.
    ASSERT_EQ(q.producer->setDequeueTimeout(ms2ns(30)), NO_ERROR);
    std::thread timed([&] { blocked = q.post(); });
    ASSERT_TRUE(clock.waitForWaiters(1));
    clock.advance(ms2ns(30) - 1);
    EXPECT_EQ(clock.waiters(), 1u);
    clock.advance(1);
    timed.join();
    EXPECT_EQ(blocked, TIMED_OUT);
    ASSERT_EQ(q.producer->setDequeueTimeout(0), NO_ERROR);
    EXPECT_EQ(q.post(), WOULD_BLOCK);
}

TEST(BufferQueueTest, AnAbandonedQueueAnswersNoInitAndLetsItsBuffersGo) {
    ManualClock clock;
    Queue q;
    ASSERT_EQ(native_window_api_connect(q.window(), NATIVE_WINDOW_API_CPU), 0);
    ASSERT_EQ(q.post(), 0);
    BufferItem item;
    ASSERT_EQ(q.consumer->acquireBuffer(&item, 0), NO_ERROR);
    sp<GraphicBuffer> held = item.mGraphicBuffer;
    ASSERT_EQ(q.post(), 0);
    ASSERT_EQ(q.post(), 0);
    std::thread producer([&] { EXPECT_EQ(q.post(), NO_INIT); });  // blocked, then woken
    ASSERT_TRUE(clock.waitForWaiters(1));
    q.consumer.clear();  // the last reference abandons
    producer.join();
    int value = 0;
    EXPECT_EQ(q.producer->query(NATIVE_WINDOW_WIDTH, &value), NO_INIT);
    EXPECT_EQ(q.post(), NO_INIT);
    EXPECT_EQ(native_window_api_connect(q.window(), NATIVE_WINDOW_API_EGL), NO_INIT);
    EXPECT_EQ(native_window_api_disconnect(q.window(), NATIVE_WINDOW_API_CPU), 0);
    item = BufferItem();
    EXPECT_EQ(held->getStrongCount(), 1);  // only this test holds it
}

TEST(BufferQueueTest, ProducerCallbacksAndConsumerRunOnTheirOwnThreads) {
    Queue q;
    struct Counter : ConsumerBase::FrameAvailableListener {
        std::atomic<int> frames{0};
        void onFrameAvailable(const BufferItem&) override { ++frames; }
    };
    sp<Counter> counter = new Counter();
    q.consumer->setFrameAvailableListener(counter);
    const int kFrames = 300;
    std::thread consumer([&] {
        uint64_t last = 0;
        for (int taken = 0; taken < kFrames;) {
            BufferItem item;
            if (q.consumer->acquireBuffer(&item, 0) != NO_ERROR) continue;
            EXPECT_EQ(item.mFrameNumber, last + 1);
            last = item.mFrameNumber;
            ++taken;
            q.consumer->releaseBuffer(item);
        }
    });
    for (int i = 0; i < kFrames; ++i) ASSERT_EQ(q.post(i + 1), 0);
    consumer.join();
    EXPECT_EQ(counter->frames.load(), kFrames);
}

TEST(BufferQueueTest, MisuseGetsItsStatus) {
    Queue q;
    LogCapture log;
    ANativeWindow* w = q.window();
    int slot = -1;
    BufferItem item;
    const struct {
        const char* what;
        std::function<int()> call;
        int status;
    } cases[] = {
        // clang-format off
        {"queue a slot never dequeued", [&] { return q.producer->queueBuffer(2, {}, nullptr); },
         BAD_VALUE},
        {"cancel a slot never dequeued", [&] { return q.producer->cancelBuffer(0); }, BAD_VALUE},
        {"request a slot out of range",
         [&] { sp<GraphicBuffer> b; return q.producer->requestBuffer(9, &b); }, BAD_VALUE},
        {"nine slots", [&] { return native_window_set_buffer_count(w, 9); }, BAD_VALUE},
        {"odd geometry", [&] { return native_window_set_buffers_geometry(w, 4, 0, 1); }, BAD_VALUE},
        {"unknown perform", [&] { return w->perform(w, 99); }, NAME_NOT_FOUND},
        {"unknown query", [&] { int v; return w->query(w, 99, &v); }, BAD_VALUE},
        {"connect no API", [&] { return native_window_api_connect(w, 0); }, BAD_VALUE},
        {"connect", [&] { return native_window_api_connect(w, NATIVE_WINDOW_API_EGL); }, NO_ERROR},
        {"connect twice", [&] { return native_window_api_connect(w, NATIVE_WINDOW_API_CPU); },
         BAD_VALUE},
        {"disconnect another API",
         [&] { return native_window_api_disconnect(w, NATIVE_WINDOW_API_CPU); }, BAD_VALUE},
        {"acquire from an empty queue", [&] { return q.consumer->acquireBuffer(&item, 0); },
         IGraphicBufferConsumer::NO_BUFFER_AVAILABLE},
        {"zero default size", [&] { return q.raw->setDefaultBufferSize(0, 4); }, BAD_VALUE},
        {"dequeue", [&] { return q.producer->dequeueBuffer(&slot, 0, 0, 0, 0) &
                                 ~IGraphicBufferProducer::BUFFER_NEEDS_REALLOCATION; }, NO_ERROR},
        {"buffer count with a buffer out", [&] { return native_window_set_buffer_count(w, 4); },
         INVALID_OPERATION},
        {"queue", [&] { return q.producer->queueBuffer(slot, {}, nullptr); }, NO_ERROR},
        {"acquire", [&] { return q.consumer->acquireBuffer(&item, 0); }, NO_ERROR},
        {"release a stale frame number",
         [&] { return q.raw->releaseBuffer(item.mSlot, 7, EGL_NO_DISPLAY, EGL_NO_SYNC_KHR); },
         IGraphicBufferConsumer::STALE_BUFFER_SLOT},
        {"release", [&] { return q.consumer->releaseBuffer(item); }, NO_ERROR},
        {"release twice", [&] { return q.consumer->releaseBuffer(item); }, BAD_VALUE},
        {"every slot with the producer, one more", [&] {
             for (int i = 0; i < 3; ++i) q.producer->dequeueBuffer(&slot, 0, 0, 0, 0);
             return q.producer->dequeueBuffer(&slot, 0, 0, 0, 0); }, INVALID_OPERATION},
        // clang-format on
    };
    for (const auto& c : cases) EXPECT_EQ(c.call(), c.status) << c.what;
    EXPECT_EQ(log.texts(),
              (std::vector<std::string>{"BufferQueue: queueBuffer: slot 2 is not dequeued"}));
}

}  // namespace
