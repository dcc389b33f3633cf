// The host video encoder at 1280x720: RGBA frames queued into its buffer
// queue as fast as it takes them (room for all of them, so none is dropped),
// converted to 4:2:0 and encoded by libx264 into an MP4, until close()
// returns with the file written. The peer is the ffmpeg program encoding the
// same raw RGBA frames, piped in from memory, with the same libx264 preset,
// quality and threads (its own start-up included). The two take turns run by
// run, so load from elsewhere on the machine falls on both.
#include <android/log.h>
#include <benchmark/benchmark.h>
#include <stdio.h>
#include <stdlib.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <string>
#include <vector>

#include <gui/Surface.h>

#include "kivhost/VideoEncoder.h"
#include "kivhost/VirtualCamera.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_log.h"

namespace {

constexpr int kWidth = 1280;
constexpr int kHeight = 720;
constexpr int kDistinct = 48;  // two seconds of different frames
constexpr int kFrames = 96;    // each run encodes them twice over
constexpr int kRuns = 5;

std::vector<double> gOurs, gPeer, gOursCost;
bool gFailed = false;

void quietLog(int, const char*, ...) {}

double median(std::vector<double> v) {
    std::sort(v.begin(), v.end());
    return v.empty() ? 0.0 : v[v.size() / 2];
}

std::vector<std::vector<unsigned char>> makeFrames() {
    std::vector<std::vector<unsigned char>> frames;
    auto generator = kivhost::VirtualCamera_generator(kWidth, kHeight);
    VCImage* nv21 = VCImage_createNew(kWidth, kHeight, VC_FORMAT_NV21);
    for (int i = 0; i < kDistinct; ++i) {
        generator->render(i, nv21);
        frames.emplace_back((size_t)kWidth * kHeight * 4);
        VCImage* rgba =
            VCImage_createWrap(frames.back().data(), kWidth, kHeight, VC_FORMAT_RGBA, 0, 0);
        VCImage_convert(nv21, rgba);
        VCImage_destroy(rgba);
    }
    VCImage_destroy(nv21);
    return frames;
}

kivhost::VideoEncoderSettings settings() {
    kivhost::VideoEncoderSettings s;
    s.width = kWidth;
    s.height = kHeight;
    s.backlog = kFrames;
    return s;
}

// Seconds for ours, and the encoder's own conversion and encoding time a frame.
bool runOurs(const std::vector<std::vector<unsigned char>>& frames, const std::string& path,
             double* seconds, double* cost) {
    const auto start = std::chrono::steady_clock::now();
    auto encoder = kivhost::VideoEncoder::open(path, settings());
    if (encoder == nullptr) return false;
    android::sp<android::Surface> surface = new android::Surface(encoder->getProducer());
    ANativeWindow* window = surface.get();
    native_window_api_connect(window, NATIVE_WINDOW_API_CPU);
    native_window_set_usage(window, android::GraphicBuffer::USAGE_SW_WRITE_OFTEN);
    for (int i = 0; i < kFrames; ++i) {
        ANativeWindowBuffer* native = nullptr;
        int fence = -1;
        if (window->dequeueBuffer(window, &native, &fence) != 0) return false;
        android::GraphicBuffer* buffer = android::GraphicBuffer::from(native);
        void* pixels = nullptr;
        if (buffer->getStride() != (uint32_t)kWidth ||
            buffer->lock(android::GraphicBuffer::USAGE_SW_WRITE_OFTEN, &pixels) != 0) {
            return false;
        }
        const std::vector<unsigned char>& frame = frames[i % frames.size()];
        std::copy(frame.begin(), frame.end(), static_cast<unsigned char*>(pixels));
        buffer->unlock();
        native_window_set_buffers_timestamp(window, (int64_t)i * 1000000000LL / 24);
        if (window->queueBuffer(window, native, -1) != 0) return false;
    }
    if (encoder->close() != 0) return false;
    *seconds = std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
    const kivhost::VideoEncoderStats stats = encoder->stats();
    *cost = (stats.convertNanos + stats.encodeNanos) / 1e9 / kFrames;
    return stats.encoded == (uint64_t)kFrames && stats.dropped == 0;
}

bool runPeer(const std::vector<std::vector<unsigned char>>& frames, const std::string& path,
             double* seconds) {
    const kivhost::VideoEncoderSettings s = settings();
    char command[512];
    snprintf(command, sizeof(command),
             "ffmpeg -v error -y -f rawvideo -pix_fmt rgba -s %dx%d -r 24 -i - -c:v libx264 "
             "-preset %s -crf %d -threads %d -pix_fmt yuv420p %s",
             kWidth, kHeight, s.preset.c_str(), s.crf, s.threads, path.c_str());
    const auto start = std::chrono::steady_clock::now();
    FILE* pipe = popen(command, "w");
    if (pipe == nullptr) return false;
    bool ok = true;
    for (int i = 0; i < kFrames && ok; ++i) {
        const std::vector<unsigned char>& frame = frames[i % frames.size()];
        ok = fwrite(frame.data(), 1, frame.size(), pipe) == frame.size();
    }
    ok = pclose(pipe) == 0 && ok;
    *seconds = std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
    return ok;
}

void BM_VideoEncoder_Interleaved(benchmark::State& state) {
    const std::vector<std::vector<unsigned char>> frames = makeFrames();
    char folder[] = "/tmp/kiv_bench_XXXXXX";
    if (mkdtemp(folder) == nullptr) {
        state.SkipWithError("no temporary folder");
        return;
    }
    const std::string ours = std::string(folder) + "/ours.mp4";
    const std::string peer = std::string(folder) + "/peer.mp4";
    for (auto _ : state) {
        double oursSeconds = 0, peerSeconds = 0, cost = 0;
        if (!runOurs(frames, ours, &oursSeconds, &cost) || !runPeer(frames, peer, &peerSeconds)) {
            gFailed = true;
            state.SkipWithError("a side failed (or ours dropped frames)");
            break;
        }
        gOurs.push_back(oursSeconds / kFrames);
        gPeer.push_back(peerSeconds / kFrames);
        gOursCost.push_back(cost);
    }
    unlink(ours.c_str());
    unlink(peer.c_str());
    rmdir(folder);
}

BENCHMARK(BM_VideoEncoder_Interleaved)
    ->Iterations(kRuns)
    ->Unit(benchmark::kMillisecond)
    ->UseRealTime();

}  // namespace

int main(int argc, char** argv) {
    VF_LogMsg = quietLog;
    __android_log_set_minimum_priority(ANDROID_LOG_ERROR);
    benchmark::Initialize(&argc, argv);
    benchmark::RunSpecifiedBenchmarks();
    benchmark::Shutdown();
    if (gFailed || gOurs.empty()) {
        fprintf(stderr, "bench_video_encoder: a side did not run\n");
        return 1;
    }
    auto range = [](std::vector<double> v) {
        std::sort(v.begin(), v.end());
        return std::make_pair(v.front() * 1e3, v.back() * 1e3);
    };
    const auto o = range(gOurs), p = range(gPeer);
    printf(
        "video_encoder %dx%d, %d frames a run: ours %.2f ms/frame (%.2f-%.2f; conversion and "
        "encoding alone %.2f), ffmpeg -c:v libx264 %.2f ms/frame (%.2f-%.2f), median of %zu\n",
        kWidth, kHeight, kFrames, median(gOurs) * 1e3, o.first, o.second, median(gOursCost) * 1e3,
        median(gPeer) * 1e3, p.first, p.second, gOurs.size());
    printf("ratio video_encoder ours/ffmpeg = %.2f (target <= 1.1)\n",
           median(gOurs) / median(gPeer));
    return 0;
}
