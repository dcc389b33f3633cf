// The host video encoder: the queue's consumer side and its two threads.
extern "C" {}

#include "kivhost/VideoEncoder.h"

#include <chrono>
#include <cmath>
#include <condition_variable>
#include <deque>
#include <memory>
#include <mutex>
#include <thread>
#include <vector>

#include <gui/BufferItemConsumer.h>
#include <gui/BufferQueue.h>

#include "HostVideoLibrary.h"
#include "core/egl/HalPixelFormat.h"
#include "kivhost/BackgroundThread.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_error.h"
#include "vccore/vc_log.h"

#define VC_SOURCE "host/media/VideoEncoder"

using android::BufferItem;
using android::BufferItemConsumer;
using android::GraphicBuffer;
using android::IGraphicBufferConsumer;
using android::sp;

namespace kivhost {

namespace {

int64_t steadyNanos() {
    return std::chrono::duration_cast<std::chrono::nanoseconds>(
               std::chrono::steady_clock::now().time_since_epoch())
        .count();
}

}  // namespace

struct VideoEncoder::State {
    struct Job {
        AVFrame* frame;
        int64_t pts;
    };

    std::mutex lock;
    std::condition_variable intakeWake;  // a frame came, the backlog shrank, or close()
    std::condition_variable encodeWake;  // a job came, the intake ended, or a hold ended
    bool frameSignalled = false;
    bool closing = false;
    bool intakeDone = false;
    bool hold = false;  // tests: the encoder's thread waits
    bool failed = false;
    int status = 0;
    bool closed = false;
    std::deque<Job> jobs;
    std::vector<AVFrame*> pool;
    VideoEncoderStats stats;
    uint64_t taken = 0;  // frames acquired from the queue
    bool warnedBehind = false;
    bool warnedFormat = false;
    bool haveFirst = false;
    int64_t firstTimestamp = 0;
    int64_t lastPts = -1;


    sp<BufferItemConsumer> consumer;
    sp<BufferItemConsumer::FrameAvailableListener> signal;
    std::vector<uint8_t> scratch;  // the intake thread's
    std::unique_ptr<Mp4VideoWriter> writer;
    std::thread intake;
    std::thread encode;

    ~State() {
        for (Job& job : jobs) writer->freeFrame(job.frame);
        for (AVFrame* frame : pool) writer->freeFrame(frame);
    }
};

namespace {

// Held weakly by the queue; tells the intake thread that frames came.
class FrameSignal : public BufferItemConsumer::FrameAvailableListener {
public:
    explicit FrameSignal(const std::shared_ptr<VideoEncoder::State>& state) : mState(state) {}
    void onFrameAvailable(const BufferItem&) override;

private:
    std::weak_ptr<VideoEncoder::State> mState;
};

// Converts the buffer's RGB pixels into the frame's YUVP bytes; false for a
// buffer the video cannot take (logged once per encoder by the caller).
bool convertFrame(const sp<GraphicBuffer>& buffer, unsigned char* yuv, int frameWidth,
                  int frameHeight, std::vector<uint8_t>* scratch) {
    const uint32_t fourcc = HalPixelFormat::fourccOf(buffer->getPixelFormat(), false);
    const int width = (int)buffer->getWidth();
    const int height = (int)buffer->getHeight();
    if (!VCImage_isRGB(fourcc) || width != frameWidth || height != frameHeight) return false;
    void* pixels = nullptr;
    if (buffer->lock(GraphicBuffer::USAGE_SW_READ_OFTEN, &pixels) != android::NO_ERROR) {
        return false;
    }
    const size_t pixelBytes = VCImage_requiredSize(1, 1, fourcc);
    const size_t rowBytes = (size_t)width * pixelBytes;
    const unsigned char* rows = static_cast<const unsigned char*>(pixels);
    if (buffer->getStride() != buffer->getWidth()) {
        // The image core takes packed rows only.
        scratch->resize(rowBytes * height);
        const size_t pitch = (size_t)buffer->getStride() * pixelBytes;
        for (int y = 0; y < height; ++y) {
            std::copy_n(rows + y * pitch, rowBytes, scratch->data() + y * rowBytes);
        }
        rows = scratch->data();
    }
    VCImage source;
    source.width = width;
    source.height = height;
    source.format = fourcc;
    VCImage_wrap(&source, const_cast<unsigned char*>(rows), (int)(rowBytes * height), 0);
    VCImage target;
    target.width = width;
    target.height = height;
    target.format = VC_FORMAT_YUVP;
    VCImage_wrap(&target, yuv, (int)VCImage_requiredSize(width, height, VC_FORMAT_YUVP), 0);
    const int converted = VCImage_convert(&source, &target);
    buffer->unlock();
    return converted == 0;
}

}  // namespace

void FrameSignal::onFrameAvailable(const BufferItem&) {
    std::shared_ptr<VideoEncoder::State> state = mState.lock();
    if (state == nullptr) return;
    std::lock_guard<std::mutex> guard(state->lock);
    state->frameSignalled = true;
    state->intakeWake.notify_all();
}

VideoEncoder::VideoEncoder(const std::string& path, const VideoEncoderSettings& settings)
    : mPath(path), mSettings(settings), mState(std::make_shared<State>()) {}

std::unique_ptr<VideoEncoder> VideoEncoder::open(const std::string& path,
                                                 const VideoEncoderSettings& settings,
                                                 int* status) {
    int result = 0;
    if (settings.width < 2 || settings.height < 2 || ((settings.width | settings.height) & 1)) {
        VF_LogMsg(VF_LOG_ERROR, "VideoEncoder: cannot encode %dx%d (even sizes of 2 or more)",
                  settings.width, settings.height);
        result = VC_REPORT(VC_ERROR_INVALID_SIZE);
    } else if (!(settings.fps > 0 && settings.fps <= 1000) || settings.backlog < 1 ||
               settings.threads < 0) {
        VF_LogMsg(VF_LOG_ERROR, "VideoEncoder: cannot encode at %g fps, backlog %d, %d threads",
                  settings.fps, settings.backlog, settings.threads);
        result = VC_REPORT(VC_ERROR_INVALID_PARAM);
    }
    std::unique_ptr<VideoEncoder> encoder;
    if (result == 0) {
        encoder.reset(new VideoEncoder(path, settings));
        result = encoder->start();
        if (result != 0) encoder.reset();
    }
    if (status != nullptr) *status = result;
    return encoder;
}

int VideoEncoder::start() {
    State& s = *mState;
    const HostVideoCalls* video = HostVideo_calls();
    if (video != nullptr) s.writer.reset(video->newWriter());
    if (s.writer == nullptr) {
        s.closed = true;  // nothing to finish
        return VC_REPORT(VC_ERROR_UNSUPPORTED);
    }
    // libx264 starts its own threads as it opens; opened from a background
    // thread, they are background threads too.
    int opened = 0;
    std::thread([&] {
        BackgroundThread_enter();
        opened = s.writer->open(mPath, mSettings);
    }).join();
    if (opened != 0) {
        s.closed = true;  // nothing to finish
        return opened;
    }
    sp<IGraphicBufferConsumer> consumer;
    android::BufferQueue::createBufferQueue(&mProducer, &consumer);
    consumer->setDefaultBufferSize((uint32_t)mSettings.width, (uint32_t)mSettings.height);
    consumer->setDefaultBufferFormat(HAL_PIXEL_FORMAT_RGBA_8888);
    s.consumer = new BufferItemConsumer(
        consumer, GraphicBuffer::USAGE_SW_READ_OFTEN | GraphicBuffer::USAGE_HW_VIDEO_ENCODER);
    s.consumer->setName(android::String8("VideoEncoder"));
    // The queue holds it weakly.
    s.signal = new FrameSignal(mState);
    s.consumer->setFrameAvailableListener(s.signal);
    s.intake = std::thread(&VideoEncoder::intakeLoop, this);
    s.encode = std::thread(&VideoEncoder::encodeLoop, this);
    return 0;
}

VideoEncoder::~VideoEncoder() {
    close();
}

void VideoEncoder::fail(int status) {
    State& s = *mState;
    {
        std::lock_guard<std::mutex> guard(s.lock);
        if (s.failed) return;
        s.failed = true;
        s.status = status;
    }
    VF_LogMsg(VF_LOG_ERROR, "VideoEncoder: %s: encoding stopped (%d); the producer is let go",
              mPath.c_str(), status);
    // The producer learns it as a lost consumer (NO_INIT), as from a device's
    // encoder that died.
    abandonQueue();
}

void VideoEncoder::abandonQueue() {
    State& s = *mState;
    s.consumer->abandon();
}

// One queued frame: converted into a frame of the pool and handed to the
// encoder, or dropped. False when the queue had none.
bool VideoEncoder::takeFrame() {
    State& s = *mState;
    BufferItem item;
    if (s.consumer->acquireBuffer(&item, 0) != android::NO_ERROR) return false;
    AVFrame* frame = nullptr;
    {
        std::unique_lock<std::mutex> lock(s.lock);
        ++s.taken;
        // While closing the frames already queued are kept: wait for room.
        if (s.closing) {
            s.intakeWake.wait(lock,
                              [&] { return s.failed || (int)s.jobs.size() < mSettings.backlog; });
        }
        if (!s.failed && (int)s.jobs.size() < mSettings.backlog) {
            if (!s.pool.empty()) {
                frame = s.pool.back();
                s.pool.pop_back();
            } else {
                frame = s.writer->newFrame();
            }
        } else if (!s.failed && !s.warnedBehind) {
            s.warnedBehind = true;
            VF_LogMsg(VF_LOG_WARNING,
                      "VideoEncoder: %s: the encoder is %d frames behind; dropping frames",
                      mPath.c_str(), mSettings.backlog);
        }
    }
    const int64_t start = steadyNanos();
    bool converted = false;
    if (frame != nullptr) {
        // libx264 copies what it is given, so a pooled frame is ours again
        // once encoded; should a reference ever outlive that, take a fresh one.
        if (!s.writer->writable(frame)) {
            s.writer->freeFrame(frame);
            frame = s.writer->newFrame();
        }
        converted = frame != nullptr && convertFrame(item.mGraphicBuffer, s.writer->pixels(frame),
                                                     mSettings.width, mSettings.height, &s.scratch);
    }
    const int64_t spent = steadyNanos() - start;
    // What a dropped frame's warning says, read while the buffer is still
    // ours: once released the producer may reallocate it.
    const sp<GraphicBuffer>& b = item.mGraphicBuffer;
    const uint32_t width = b->getWidth(), height = b->getHeight();
    const int format = b->getPixelFormat();
    s.consumer->releaseBuffer(item);

    std::lock_guard<std::mutex> guard(s.lock);
    if (!converted) {
        ++s.stats.dropped;
        if (frame != nullptr) {
            s.pool.push_back(frame);
            if (!s.warnedFormat) {
                s.warnedFormat = true;
                VF_LogMsg(VF_LOG_WARNING,
                          "VideoEncoder: %s: a %ux%u frame of format %d cannot go into the "
                          "%dx%d video; dropped",
                          mPath.c_str(), width, height, format, mSettings.width, mSettings.height);
            }
        }
        return true;
    }
    if (!s.haveFirst) {
        s.haveFirst = true;
        s.firstTimestamp = item.mTimestamp;
    }
    // Presentation times from the frames' own clock, kept increasing.
    int64_t pts = (int64_t)std::llround((double)(item.mTimestamp - s.firstTimestamp) *
                                        Mp4VideoWriter::kTimeScale / 1e9);
    if (pts <= s.lastPts) pts = s.lastPts + 1;
    s.lastPts = pts;
    s.stats.convertNanos += spent;
    s.jobs.push_back({frame, pts});
    s.encodeWake.notify_all();
    return true;
}

void VideoEncoder::intakeLoop() {
    State& s = *mState;
    BackgroundThread_enter();
    auto closing = [&] {
        std::lock_guard<std::mutex> guard(s.lock);
        return s.closing;
    };
    for (;;) {
        {
            std::unique_lock<std::mutex> lock(s.lock);
            s.intakeWake.wait(lock, [&] { return s.frameSignalled || s.closing; });
            s.frameSignalled = false;
        }
        while (!closing() && takeFrame()) {
        }
        if (closing()) break;
    }
    // Frames queued before close() are still encoded; a producer that keeps
    // queueing cannot hold the close up for more than one queue's worth.
    for (int i = 0; i < android::BufferQueue::NUM_BUFFER_SLOTS && takeFrame(); ++i) {
    }
    abandonQueue();
    const uint64_t queued = s.consumer->getQueueStats().queued;  // final once abandoned
    std::lock_guard<std::mutex> guard(s.lock);
    s.stats.queued = queued;
    // What was queued after the last look is lost with the queue.
    if (s.stats.queued > s.taken) s.stats.dropped += s.stats.queued - s.taken;
    s.intakeDone = true;
    s.encodeWake.notify_all();
}

void VideoEncoder::encodeLoop() {
    State& s = *mState;
    BackgroundThread_enter();
    for (;;) {
        State::Job job;
        {
            std::unique_lock<std::mutex> lock(s.lock);
            s.encodeWake.wait(lock, [&] { return !s.hold && (!s.jobs.empty() || s.intakeDone); });
            if (s.jobs.empty()) break;
            job = s.jobs.front();
            s.jobs.pop_front();
        }
        const int64_t start = steadyNanos();
        bool failed = false;
        {
            std::lock_guard<std::mutex> guard(s.lock);
            failed = s.failed;
        }
        const int status = failed ? 0 : s.writer->write(job.frame, job.pts);
        const int64_t spent = steadyNanos() - start;
        if (status != 0) fail(status);
        std::lock_guard<std::mutex> guard(s.lock);
        if (failed || status != 0) {
            ++s.stats.dropped;
        } else {
            ++s.stats.encoded;
            s.stats.encodeNanos += spent;
        }
        s.pool.push_back(job.frame);
        s.intakeWake.notify_all();
    }
}

int VideoEncoder::close() {
    State& s = *mState;
    {
        std::lock_guard<std::mutex> guard(s.lock);
        if (s.closed) return s.status;
        s.closed = true;
        s.closing = true;
        s.hold = false;
        s.intakeWake.notify_all();
        s.encodeWake.notify_all();
    }
    s.intake.join();
    s.encode.join();
    int status = 0;
    {
        std::lock_guard<std::mutex> guard(s.lock);
        status = s.status;
    }
    if (status == 0) {
        const int64_t start = steadyNanos();
        status = s.writer->finish();
        std::lock_guard<std::mutex> guard(s.lock);
        s.stats.encodeNanos += steadyNanos() - start;
        s.status = status;
    }
    const VideoEncoderStats totals = stats();
    VF_LogMsg(status == 0 ? VF_LOG_INFO : VF_LOG_ERROR,
              "VideoEncoder: %s: %llu frames encoded, %llu dropped%s", mPath.c_str(),
              (unsigned long long)totals.encoded, (unsigned long long)totals.dropped,
              status == 0 ? "" : "; the file is not complete");
    return status;
}

VideoEncoderStats VideoEncoder::stats() const {
    State& s = *mState;
    VideoEncoderStats result;
    sp<BufferItemConsumer> consumer;
    {
        std::lock_guard<std::mutex> guard(s.lock);
        result = s.stats;
        consumer = s.consumer;
    }
    // The queue's own count (an abandoned queue keeps its final one).
    if (consumer != nullptr) {
        const uint64_t queued = consumer->getQueueStats().queued;
        if (queued > result.queued) result.queued = queued;
    }
    return result;
}

bool VideoEncoder::failed() const {
    std::lock_guard<std::mutex> guard(mState->lock);
    return mState->failed;
}

}  // namespace kivhost

#include "VideoEncoderTestSeam.h"

namespace kivhost {

void VideoEncoderTestSeam::hold(VideoEncoder& encoder, bool held) {
    std::lock_guard<std::mutex> guard(encoder.mState->lock);
    encoder.mState->hold = held;
    encoder.mState->encodeWake.notify_all();
}

uint64_t VideoEncoderTestSeam::taken(VideoEncoder& encoder) {
    std::lock_guard<std::mutex> guard(encoder.mState->lock);
    return encoder.mState->taken;
}

}  // namespace kivhost
