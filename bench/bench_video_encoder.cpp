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

#include "encoder_bench.h"
#include "kivhost/VirtualCamera.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_log.h"

namespace {

constexpr int kWidth = 1280;
constexpr int kHeight = 720;
constexpr int kDistinct = 48;  // two seconds of different frames
constexpr int kFrames = 96;    // each run encodes them twice over
constexpr int kRuns = 5;

std::vector<double> gOurs, gPeer;
bool gFailed = false;

void quietLog(int, const char*, ...) {}

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
        double oursMs = 0, peerMs = 0;
        if (!EncoderBench_ours(frames, kWidth, kHeight, kFrames, ours, &oursMs) ||
            !EncoderBench_ffmpeg(frames, kWidth, kHeight, kFrames, peer, &peerMs)) {
            gFailed = true;
            state.SkipWithError("a side failed (or ours dropped frames)");
            break;
        }
        gOurs.push_back(oursMs);
        gPeer.push_back(peerMs);
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
        return std::make_pair(v.front(), v.back());
    };
    const auto o = range(gOurs), p = range(gPeer);
    printf(
        "video_encoder %dx%d, %d frames a run: ours %.2f ms/frame (%.2f-%.2f), ffmpeg -c:v "
        "libx264 %.2f ms/frame (%.2f-%.2f), median of %zu\n",
        kWidth, kHeight, kFrames, EncoderBench_median(gOurs), o.first, o.second,
        EncoderBench_median(gPeer), p.first, p.second, gOurs.size());
    printf("ratio video_encoder ours/ffmpeg = %.2f (target <= 1.1)\n",
           EncoderBench_median(gOurs) / EncoderBench_median(gPeer));
    return 0;
}
