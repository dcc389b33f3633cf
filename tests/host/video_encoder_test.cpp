// The host video encoder: frames queued into its producer come back out of
// the MP4 (decoded here with FFmpeg) in order, at their timestamps, close to
// the pictures queued; a backlog drops and counts frames; close() and a
// failing file both let the producer go with NO_INIT.
// kiv-test-labels: threads
#include "kivhost/VideoEncoder.h"

#include <gtest/gtest.h>
#include <gui/Surface.h>

#include <signal.h>
#include <sys/resource.h>

#include <atomic>
#include <chrono>
#include <functional>
#include <thread>

#include "host/media/HostVideoLibrary.h"
#include "host/media/VideoEncoderTestSeam.h"
#include "kivhost/VirtualCamera.h"
#include "support/camera_frames.h"
#include "support/eventually.h"
#include "support/image_ptr.h"
#include "support/log_capture.h"
#include "support/temp_dir.h"
#include "support/video_files.h"
#include "vccore/vc_log.h"

using namespace android;
using kivhost::VideoEncoder;
using kivhost::VideoEncoderSettings;

namespace {

// What libx264 (crf 20) keeps of a generator frame: PSNR of the decoded
// 4:2:0 planes against the generator's own YUV, which the RGBA frame queued
// converts back to (its chroma is one sample per 2x2 block).
constexpr double kMinPsnr = 35.0;

VideoEncoderSettings sized(int width, int height) {
    VideoEncoderSettings settings;
    settings.width = width;
    settings.height = height;
    settings.threads = 1;
    return settings;
}

// A CPU producer on the encoder's queue.
struct Producer {
    explicit Producer(const sp<IGraphicBufferProducer>& producer) : surface(new Surface(producer)) {
        native_window_api_connect(surface.get(), NATIVE_WINDOW_API_CPU);
        native_window_set_usage(surface.get(), GraphicBuffer::USAGE_SW_WRITE_OFTEN);
    }
    // Queues an RGBA picture (rows top first) stamped `timestamp`: 0 or the
    // window's status.
    int queue(const std::vector<uint8_t>& rgba, int width, int64_t timestamp) {
        ANativeWindowBuffer* native = nullptr;
        int fence = -1;
        int status = surface->dequeueBuffer(surface.get(), &native, &fence);
        if (status != 0) return status;
        GraphicBuffer* buffer = GraphicBuffer::from(native);
        void* pixels = nullptr;
        if (buffer->lock(GraphicBuffer::USAGE_SW_WRITE_OFTEN, &pixels) == NO_ERROR) {
            const size_t row = (size_t)width * 4;
            const size_t pitch = (size_t)buffer->getStride() * 4;
            const size_t rows = std::min<size_t>(rgba.size() / row, buffer->getHeight());
            for (size_t y = 0; y < rows && row <= pitch; ++y) {
                std::copy_n(&rgba[y * row], row, static_cast<uint8_t*>(pixels) + y * pitch);
            }
            buffer->unlock();
        }
        native_window_set_buffers_timestamp(surface.get(), timestamp);
        return surface->queueBuffer(surface.get(), native, -1);
    }
    sp<Surface> surface;
};

int64_t frameNumber(const DecodedVideo& video, size_t i) {
    return kivhost::VirtualCamera_decodeFrameNumber(video.rgba[i].data(), video.width, video.height,
                                                    false);
}

struct Size {
    int width;
    int height;
};

class VideoEncoderSizeTest : public ::testing::TestWithParam<Size> {};

TEST_P(VideoEncoderSizeTest, EveryFrameComesBackInOrderAtItsTimestamp) {
    const Size size = GetParam();
    kivtest::TempDir dir;
    const std::string path = dir.file("out.mp4");
    const int kFrames = 12;
    VideoEncoderSettings settings = sized(size.width, size.height);
    // Frames come faster than real time here: room for all of them.
    settings.backlog = kFrames;
    int status = 1;
    std::unique_ptr<VideoEncoder> encoder = VideoEncoder::open(path, settings, &status);
    ASSERT_EQ(status, 0);
    ASSERT_NE(encoder, nullptr);
    Producer producer(encoder->getProducer());
    // Uneven steps around 41 ms, as a camera's are.
    std::vector<int64_t> stamps;
    for (int i = 0; i < kFrames; ++i) {
        stamps.push_back(5000000000LL + i * 41000000LL + (i % 3) * 1500000LL);
        ASSERT_EQ(producer.queue(CameraFrames_rgba(i, size.width, size.height), size.width,
                                 stamps.back()),
                  0);
    }
    ASSERT_EQ(encoder->close(), 0);
    kivhost::VideoEncoderStats stats = encoder->stats();
    EXPECT_EQ(stats.queued, (uint64_t)kFrames);
    EXPECT_EQ(stats.encoded, (uint64_t)kFrames);
    EXPECT_EQ(stats.dropped, 0u);

    DecodedVideo video;
    ASSERT_TRUE(VideoFiles_decode(path, &video));
    EXPECT_EQ(video.codec, "h264");
    EXPECT_TRUE(video.fullRange);
    EXPECT_EQ(video.width, size.width);
    EXPECT_EQ(video.height, size.height);
    ASSERT_EQ(video.rgba.size(), (size_t)kFrames);
    for (int i = 0; i < kFrames; ++i) {
        EXPECT_NEAR(video.seconds[i], (stamps[i] - stamps[0]) / 1e9, 1.5 / 90000) << i;
        EXPECT_EQ(frameNumber(video, i), i);
        EXPECT_GE(
            VideoFiles_psnr(video.i420[i], VideoFiles_generatedI420(i, size.width, size.height), 1),
            kMinPsnr)
            << "frame " << i;
    }
    // Closed: the producer is let go.
    EXPECT_EQ(producer.queue(CameraFrames_rgba(0, size.width, size.height), size.width, 0),
              NO_INIT);
}

// Sizes that are and are not multiples of libx264's 16-pixel blocks.
INSTANTIATE_TEST_SUITE_P(Sizes, VideoEncoderSizeTest,
                         ::testing::Values(Size{160, 96}, Size{178, 102}));

TEST(VideoEncoderTest, CloseMidStreamKeepsWhatWasTakenAndStopsTheProducer) {
    kivtest::TempDir dir;
    const std::string path = dir.file("mid.mp4");
    std::unique_ptr<VideoEncoder> encoder = VideoEncoder::open(path, sized(96, 64));
    ASSERT_NE(encoder, nullptr);
    std::atomic<int> lastStatus{0};
    std::atomic<int> sent{0};
    std::thread thread([&] {
        Producer producer(encoder->getProducer());
        for (int i = 0; i < 100000; ++i) {
            const int status = producer.queue(CameraFrames_rgba(i, 96, 64), 96, 1000000LL * i);
            if (status != 0) {
                lastStatus = status;
                return;
            }
            sent = i + 1;
        }
    });
    EXPECT_TRUE(eventually([&] { return encoder->stats().encoded >= 5; }));
    ASSERT_EQ(encoder->close(), 0);
    thread.join();
    EXPECT_EQ(lastStatus.load(), NO_INIT);
    const kivhost::VideoEncoderStats stats = encoder->stats();
    EXPECT_EQ(stats.queued, (uint64_t)sent.load());
    EXPECT_EQ(stats.encoded + stats.dropped, stats.queued);

    DecodedVideo video;
    ASSERT_TRUE(VideoFiles_decode(path, &video));
    ASSERT_EQ(video.rgba.size(), stats.encoded);
    for (size_t i = 1; i < video.rgba.size(); ++i) {
        EXPECT_GT(frameNumber(video, i), frameNumber(video, i - 1)) << i;
    }
}

TEST(VideoEncoderTest, AFailingFileLetsTheProducerGo) {
    kivtest::TempDir dir;
    int status = 0;
    std::unique_ptr<VideoEncoder> encoder =
        VideoEncoder::open(dir.file("full.mp4"), sized(160, 96), &status);
    ASSERT_EQ(status, 0);
    // A full disk from here on: writes past 16 KiB fail (EFBIG, not a signal).
    struct rlimit saved;
    ASSERT_EQ(getrlimit(RLIMIT_FSIZE, &saved), 0);
    struct rlimit small = saved;
    small.rlim_cur = 16384;
    sighandler_t previous = signal(SIGXFSZ, SIG_IGN);
    ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &small), 0);
    Producer producer(encoder->getProducer());
    int result = 0;
    for (int i = 0; i < 5000 && result == 0; ++i) {
        result = producer.queue(VCImageTest_randomBytes(160 * 96 * 4, i), 160, 1000000LL * i);  // noise: big
    }
    setrlimit(RLIMIT_FSIZE, &saved);
    signal(SIGXFSZ, previous);
    EXPECT_EQ(result, NO_INIT);
    EXPECT_TRUE(encoder->failed());
    EXPECT_EQ(encoder->close(), VC_ERROR_IO_FAILED);
    EXPECT_EQ(encoder->close(), VC_ERROR_IO_FAILED);
}

// Every status and line the encoder reports, from open() and from frames.
TEST(VideoEncoderTest, StatusesAndLogLines) {
    kivtest::TempDir dir;
    struct Case {
        std::function<void(VideoEncoderSettings*)> change;
        std::string path;
        int status;
        std::string line;    // a prefix
        const char* source;  // where the error arose
    };
    const char* const inEncoder = "host/media/VideoEncoder:";
    const char* const inWriter = "host/video/FfmpegMp4Writer:";
    const Case cases[] = {
        {[](VideoEncoderSettings* s) { s->width = 161; }, "a.mp4", VC_ERROR_INVALID_SIZE,
         "VideoEncoder: cannot encode 161x96 (even sizes of 2 or more)", inEncoder},
        {[](VideoEncoderSettings* s) { s->height = 0; }, "a.mp4", VC_ERROR_INVALID_SIZE,
         "VideoEncoder: cannot encode 160x0 (even sizes of 2 or more)", inEncoder},
        {[](VideoEncoderSettings* s) { s->fps = 0; }, "a.mp4", VC_ERROR_INVALID_PARAM,
         "VideoEncoder: cannot encode at 0 fps, backlog 8, 1 threads", inEncoder},
        {[](VideoEncoderSettings* s) { s->backlog = 0; }, "a.mp4", VC_ERROR_INVALID_PARAM,
         "VideoEncoder: cannot encode at 24 fps, backlog 0, 1 threads", inEncoder},
        {[](VideoEncoderSettings*) {}, "missing/a.mp4", VC_ERROR_IO_FAILED,
         "VideoEncoder: cannot write " + dir.file("missing/a.mp4") + ": No such file or directory",
         inWriter},
        {[](VideoEncoderSettings* s) { s->preset = "nonsense"; }, "a.mp4", VC_ERROR_CODEC_FAILED,
         "VideoEncoder: cannot start libx264 (preset nonsense, crf 20): ", inWriter},
    };
    for (const Case& c : cases) {
        LogCapture log;
        VideoEncoderSettings settings = sized(160, 96);
        c.change(&settings);
        int status = 0;
        EXPECT_EQ(VideoEncoder::open(dir.file(c.path), settings, &status), nullptr) << c.line;
        EXPECT_EQ(status, c.status) << c.line;
        EXPECT_EQ(log.countPrefix(c.line, VF_LOG_ERROR), 1u) << c.line;
        EXPECT_EQ(log.countPrefix(std::string(VCError_name(c.status)) + " (" +
                                  std::to_string(c.status) + "): " + c.source),
                  1u)
            << c.line;
        EXPECT_FALSE(kivtest::fileExists(dir.file(c.path))) << c.line;
    }

    // A frame of another size, then a backlog of two while the encoder is held.
    LogCapture log;
    const std::string path = dir.file("b.mp4");
    VideoEncoderSettings settings = sized(96, 64);
    settings.backlog = 2;
    std::unique_ptr<VideoEncoder> encoder = VideoEncoder::open(path, settings);
    ASSERT_NE(encoder, nullptr);
    kivhost::VideoEncoderTestSeam::hold(*encoder, true);
    Producer producer(encoder->getProducer());
    native_window_set_buffers_dimensions(producer.surface.get(), 64, 64);
    ASSERT_EQ(producer.queue(CameraFrames_rgba(0, 64, 64), 64, 0), 0);
    native_window_set_buffers_dimensions(producer.surface.get(), 0, 0);
    for (int i = 1; i <= 5; ++i) ASSERT_EQ(producer.queue(CameraFrames_rgba(i, 96, 64), 96, i), 0);
    EXPECT_TRUE(eventually([&] { return encoder->stats().dropped == 4; }));
    EXPECT_EQ(kivhost::VideoEncoderTestSeam::taken(*encoder), 6u);
    ASSERT_EQ(encoder->close(), 0);
    EXPECT_EQ(encoder->stats().encoded, 2u);
    EXPECT_EQ(log.count("VideoEncoder: " + path +
                        ": a 64x64 frame of format 1 cannot go into the 96x64 video; dropped"),
              1u);
    EXPECT_EQ(
        log.count("VideoEncoder: " + path + ": the encoder is 2 frames behind; dropping frames"),
        1u);
    EXPECT_EQ(log.count("VideoEncoder: " + path + ": 2 frames encoded, 4 dropped"), 1u);
    DecodedVideo video;
    ASSERT_TRUE(VideoFiles_decode(path, &video));
    ASSERT_EQ(video.rgba.size(), 2u);
    EXPECT_EQ(frameNumber(video, 0), 1);
    EXPECT_EQ(frameNumber(video, 1), 2);
}

}  // namespace

// FFmpeg is opened on first use: without its library nothing is written, the
// caller learns why once, and the library is found again once it is back.
TEST(VideoEncoderTest, WithoutTheVideoLibraryNothingOpens) {
    kivtest::TempDir dir;
    LogCapture log;
    kivhost::HostVideo_reloadForTesting("libkiv_no_video_here.so");
    int status = 0;
    EXPECT_EQ(VideoEncoder::open(dir.file("a.mp4"), sized(160, 96), &status), nullptr);
    EXPECT_EQ(status, VC_ERROR_UNSUPPORTED);
    EXPECT_EQ(kivhost::VirtualCamera_video(dir.file("a.mp4"), 96, 64, false), nullptr);
    EXPECT_EQ(log.countPrefix("HostVideo: no video support (libkiv_no_video_here.so): "
                              "libkiv_no_video_here.so: cannot open shared object file",
                              VF_LOG_ERROR),
              1u);
    EXPECT_EQ(log.countPrefix("VC_ERROR_UNSUPPORTED (-"), 1u);
    EXPECT_FALSE(kivtest::fileExists(dir.file("a.mp4")));
    kivhost::HostVideo_reloadForTesting(nullptr);
    std::unique_ptr<VideoEncoder> encoder = VideoEncoder::open(dir.file("a.mp4"), sized(160, 96));
    ASSERT_NE(encoder, nullptr);
    EXPECT_EQ(encoder->close(), 0);
}
