// The live pipeline with recording at 1280x720: the virtual camera's bars at
// 24 frames a second for 20 s through Sepia into a preview window this
// program reads, and into the host video encoder through the manager's
// recording path. It reports the preview's frame intervals (p50, p99, between
// the times the frames' pixels were there, and between their queue times, as
// in bench_live_preview), the camera frames never
// rendered and the frames recorded. Then the encoder's cost a frame: frames
// kept from that preview, as many as were recorded, encoded by the host
// encoder alone and by the ffmpeg program alone with the same libx264
// settings, in turns, three runs each.
#include <android/log.h>
#include <benchmark/benchmark.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#include <chrono>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include <gui/HostWindow.h>

#include "core/KivImaging.h"
#include "encoder_bench.h"
#include "kivhost/VirtualCamera.h"
#include "kivimaging/OpenGLManager.h"
#include "tools/kivimaging/live_stats.h"
#include "vccore/vc_log.h"

namespace {

constexpr int kWidth = 1280;
constexpr int kHeight = 720;
constexpr int kFps = 24;
constexpr int kSeconds = 20;
constexpr int kPeerFrames = 48;  // distinct preview frames kept for the peer
constexpr uint64_t kWarmUp = 11;

struct Result {
    double p50 = 0, p99 = 0, queuedP50 = 0, queuedP99 = 0;
    uint64_t rendered = 0, dropped = 0, recorded = 0, recordable = 0;
    double encoderMs = 0, peerMs = 0;
    bool ok = false;
} gResult;

void quietLog(int, const char*, ...) {}

void BM_LiveRecord(benchmark::State& state) {
    char folder[] = "/tmp/kiv_bench_XXXXXX";
    if (mkdtemp(folder) == nullptr) {
        state.SkipWithError("no temporary folder");
        return;
    }
    const std::string recording = std::string(folder) + "/live.mp4";
    const std::string peer = std::string(folder) + "/peer.mp4";
    for (auto _ : state) {
        KivFilter* sepia = KivImaging_create(401, nullptr);
        KivImaging imaging(sepia);
        kivhost::VideoEncoderSettings settings;
        settings.width = kWidth;
        settings.height = kHeight;
        settings.fps = kFps;
        auto encoder = kivhost::VideoEncoder::open(recording, settings);
        kivhost::VirtualCamera camera(kivhost::VirtualCamera_generator(kWidth, kHeight), kWidth,
                                      kHeight);
        android::sp<android::HostWindow> preview = new android::HostWindow(kWidth, kHeight);
        android::sp<OpenGLManager> manager =
            new OpenGLManager(OPENGL_MANAGER_DIRECT, DISPLAY_DEVICE_GPU);
        manager->setCameraSize(kWidth, kHeight, 0, 0);
        manager->setPreviewWindow(preview, CAMERA_LAYOUT_SINGLE);
        manager->setFilter(&imaging);
        manager->startRenderThread();
        android::sp<ANativeWindow> window = manager->getNewPreviewWindowForOpenGL(0);
        if (encoder == nullptr || window == nullptr || camera.connect(window) != 0) {
            state.SkipWithError("the pipeline did not start");
            manager->release();
            KivImaging_destroy(sepia);
            break;
        }
        manager->notifyGLSurfaceConnectionComplete();
        camera.start(kFps);
        kivcli::LiveStats stats(kWarmUp), queued(kWarmUp);
        std::vector<std::vector<uint8_t>> kept;
        bool recording = false;
        uint64_t sentAtStart = 0, renderedAtStart = 0;
        const auto start = std::chrono::steady_clock::now();
        while (std::chrono::steady_clock::now() - start < std::chrono::seconds(kSeconds)) {
            android::sp<android::GraphicBuffer> frame;
            uint64_t number = 0;
            int64_t timestamp = 0, ready = 0;
            while (preview->acquireFrame(&frame, &number, &timestamp, &ready) ==
                   android::NO_ERROR) {
                stats.add(number, ready);
                queued.add(number, timestamp);
                void* pixels = nullptr;
                if (stats.frames() > kWarmUp && kept.size() < (size_t)kPeerFrames &&
                    frame->lock(android::GraphicBuffer::USAGE_SW_READ_OFTEN, &pixels) == 0) {
                    std::vector<uint8_t> rgba((size_t)kWidth * kHeight * 4);
                    for (int y = 0; y < kHeight; ++y) {
                        memcpy(&rgba[(size_t)y * kWidth * 4],
                               (uint8_t*)pixels + (size_t)y * frame->getStride() * 4,
                               (size_t)kWidth * 4);
                    }
                    kept.push_back(std::move(rgba));
                    frame->unlock();
                }
                preview->releaseFrame(frame);
                if (stats.frames() == kWarmUp) {
                    sentAtStart = camera.framesQueued() + camera.framesNotQueued();
                    renderedAtStart = preview->queuedTotal();
                }
            }
            // Recording starts once the first frame is drawn (the program exists).
            if (!recording && stats.frames() > 0) {
                recording = manager->setRecordingSurface(encoder->getProducer()) == 0;
            }
            std::this_thread::sleep_for(std::chrono::milliseconds(2));
        }
        camera.stop();
        const uint64_t sent = camera.framesQueued() + camera.framesNotQueued() - sentAtStart;
        gResult.rendered = preview->queuedTotal();
        const uint64_t paced = gResult.rendered - renderedAtStart;
        manager->setRecordingSurface(nullptr);
        manager->release();
        camera.disconnect();
        KivImaging_destroy(sepia);
        const bool closed = encoder->close() == 0;
        const kivhost::VideoEncoderStats e = encoder->stats();
        gResult.p50 = stats.percentile(50);
        gResult.p99 = stats.percentile(99);
        gResult.queuedP50 = queued.percentile(50);
        gResult.queuedP99 = queued.percentile(99);
        gResult.dropped = sent > paced ? sent - paced : 0;
        gResult.recorded = e.encoded;
        gResult.recordable = e.queued;
        std::vector<double> ours, peers;
        bool encoded = !kept.empty();
        for (int run = 0; run < 3 && encoded; ++run) {
            double o = 0, p = 0;
            encoded = EncoderBench_ours(kept, kWidth, kHeight, (int)e.encoded, peer, &o) &&
                      EncoderBench_ffmpeg(kept, kWidth, kHeight, (int)e.encoded, peer, &p);
            ours.push_back(o);
            peers.push_back(p);
        }
        gResult.encoderMs = EncoderBench_median(ours);
        gResult.peerMs = EncoderBench_median(peers);
        gResult.ok = closed && recording && encoded;
        if (!gResult.ok) state.SkipWithError("recording or the peer failed");
    }
    unlink(recording.c_str());
    unlink(peer.c_str());
    rmdir(folder);
}

BENCHMARK(BM_LiveRecord)->Iterations(1)->Unit(benchmark::kSecond)->UseRealTime();

}  // namespace

int main(int argc, char** argv) {
    VF_LogMsg = quietLog;
    __android_log_set_minimum_priority(ANDROID_LOG_ERROR);
    kivhost::HostVideo_setVerbose(false);
    if (getenv("EGL_PLATFORM") == nullptr) setenv("EGL_PLATFORM", "surfaceless", 0);
    benchmark::Initialize(&argc, argv);
    benchmark::RunSpecifiedBenchmarks();
    benchmark::Shutdown();
    if (!gResult.ok) {
        fprintf(stderr, "bench_live_record: the run did not complete\n");
        return 1;
    }
    const Result& r = gResult;
    printf(
        "live_record %dx%d at %d fps for %d s, Sepia, preview + recording: interval p50 %.1f ms, "
        "p99 %.1f ms (target <= 43; pixels there; queued: p50 %.1f ms, p99 %.1f ms); %llu "
        "rendered, %llu dropped (target 0); recorded %llu of %llu "
        "frames queued to the encoder; on frames of that preview, the host encoder %.2f ms/frame, "
        "ffmpeg -c:v libx264 %.2f ms/frame (medians of 3, in turns)\n",
        kWidth, kHeight, kFps, kSeconds, r.p50, r.p99, r.queuedP50, r.queuedP99,
        (unsigned long long)r.rendered, (unsigned long long)r.dropped,
        (unsigned long long)r.recorded, (unsigned long long)r.recordable, r.encoderMs, r.peerMs);
    printf("ratio live_record p99/period = %.2f (target <= 1.05)\n", r.p99 / 41.0);
    printf("ratio live_record encoder/ffmpeg = %.2f\n", r.encoderMs / r.peerMs);
    return 0;
}
