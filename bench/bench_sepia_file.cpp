// A 4000x3000 JPEG through Sepia (401) into a quality-98 JPEG, file to file,
// against libvips' command line doing the same colour matrix ("vips recomb",
// [Q=98,subsample-mode=on]: 4:2:0 as ours) in the same run. Ours is processFile's own native path
// (processFilePath: load as NV21, doProcessNV21 into RGBA, save as JPEG at
// quality 98). vips is timed as the process it is; its start-up (the same
// command on a 16x16 picture) is reported beside it. The two sides alternate
// run by run. A second pass times our three steps one by one to show where
// the time goes.
#include <benchmark/benchmark.h>
#include <stdio.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <android/log.h>

#include <algorithm>
#include <chrono>
#include <cmath>
#include <string>
#include <vector>

#include "core/VFilterBufferedProcessorImpl.h"
#include "file_bench.h"
#include "vccore/vc_file.h"
#include "vccore/vc_log.h"

namespace {

constexpr int kWidth = 4000;
constexpr int kHeight = 3000;
constexpr int kQuality = 98;
constexpr int kRuns = 5;

using namespace filebench;

std::string gDir;
std::vector<double> gOurs, gVips, gVipsStartup;
// Where our time goes: decoding, the GPU pass, encoding and writing.
std::vector<double> gDecode, gProcess, gEncode;

// The Sepia effect's matrix, rows for R, G and B.
bool writeMatrix(const std::string& path) {
    FILE* f = fopen(path.c_str(), "w");
    if (f == nullptr) return false;
    fprintf(f,
            "3 3\n"
            "0.393 0.769 0.189\n"
            "0.349 0.686 0.168\n"
            "0.272 0.536 0.131\n");
    return fclose(f) == 0;
}

// Runs `vips recomb` from `in` to `out`; seconds, or -1 on failure.
double runVips(const std::string& in, const std::string& out);

// Ours and vips take turns, one run each per iteration, so that load from
// elsewhere on the machine falls on both sides alike.
void BM_SepiaFile_OursAndVips(benchmark::State& state) {
    const std::string in = gDir + "/input.jpg", out = gDir + "/ours.jpg";
    auto* processor = static_cast<VFilterBufferedProcessorImpl*>(BufferedProcessor_Create());
    processor->initialize();
    processor->setEffect(401);
    for (auto _ : state) {
        unlink(out.c_str());
        auto start = std::chrono::steady_clock::now();
        auto status = processor->processFilePath(in.c_str(), [&]() { return out.c_str(); });
        auto stop = std::chrono::steady_clock::now();
        if (status != VFilterBufferedProcessorImpl::FILE_OK || fileSize(out) <= 0) {
            state.SkipWithError("processFilePath failed");
            break;
        }
        double vips = runVips(in, gDir + "/vips.jpg");
        if (vips < 0) {
            state.SkipWithError("vips recomb failed (is libvips-tools installed?)");
            break;
        }
        gOurs.push_back(seconds(stop - start));
        gVips.push_back(vips);
    }
    processor->release();
    BufferedProcessor_Destroy(processor);
}

// The same three steps called one by one, only to split the time above.
void BM_SepiaFile_OurSteps(benchmark::State& state) {
    const std::string in = gDir + "/input.jpg", out = gDir + "/steps.jpg";
    auto* processor = static_cast<VFilterBufferedProcessorImpl*>(BufferedProcessor_Create());
    processor->initialize();
    processor->setEffect(401);
    for (auto _ : state) {
        using Clock = std::chrono::steady_clock;
        auto start = Clock::now();
        VCImage* nv21 = VCImage_createEmpty(0, 0, VC_FORMAT_NV21);
        int rc = VCImage_loadFromFile(nv21, in.c_str());
        VCImage* rgba =
            rc == VC_OK ? VCImage_createNew(nv21->width, nv21->height, VC_FORMAT_RGBA) : nullptr;
        auto decoded = Clock::now(), processed = decoded;
        if (rgba != nullptr) {
            rc = processor->doProcessNV21(nv21->data, nv21->width, nv21->height, rgba->data);
            processed = Clock::now();
            if (rc == VC_OK) rc = VCImage_saveToFile(rgba, out.c_str(), kQuality);
        }
        bool ok = rgba != nullptr && rc == VC_OK;
        VCImage_destroy(rgba);
        VCImage_destroy(nv21);
        auto stop = Clock::now();
        if (!ok) {
            state.SkipWithError("a step failed");
            break;
        }
        gDecode.push_back(seconds(decoded - start));
        gProcess.push_back(seconds(processed - decoded));
        gEncode.push_back(seconds(stop - processed));
    }
    processor->release();
    BufferedProcessor_Destroy(processor);
}

double runVips(const std::string& in, const std::string& out) {
    const std::string cmd = "vips recomb '" + in + "' '" + out + "[Q=" + std::to_string(kQuality) +
                            ",subsample-mode=on]' '" + gDir + "/sepia.mat'";
    return timeCommand(cmd, out);
}

// The process start-up and library set-up share of a vips run.
void BM_SepiaFile_VipsStartup(benchmark::State& state) {
    const std::string in = gDir + "/tiny.jpg", out = gDir + "/tiny_vips.jpg";
    for (auto _ : state) {
        double t = runVips(in, out);
        if (t < 0) {
            state.SkipWithError("vips recomb failed on the small picture");
            break;
        }
        gVipsStartup.push_back(t);
    }
}

BENCHMARK(BM_SepiaFile_OursAndVips)
    ->Iterations(kRuns)
    ->Unit(benchmark::kMillisecond)
    ->UseRealTime();
BENCHMARK(BM_SepiaFile_OurSteps)->Iterations(kRuns)->Unit(benchmark::kMillisecond)->UseRealTime();
BENCHMARK(BM_SepiaFile_VipsStartup)
    ->Iterations(kRuns)
    ->Unit(benchmark::kMillisecond)
    ->UseRealTime();

}  // namespace

int main(int argc, char** argv) {
    // Per-call debug lines would be timed too; errors still show.
    quietHeadless();
    gDir = makeTempDir("bench_sepia_file");
    if (gDir.empty()) return 1;
    if (!writeInput(gDir + "/input.jpg", kWidth, kHeight) ||
        !writeInput(gDir + "/tiny.jpg", 16, 16) || !writeMatrix(gDir + "/sepia.mat")) {
        fprintf(stderr, "bench_sepia_file: cannot write the input files in %s\n", gDir.c_str());
        return 1;
    }
    benchmark::Initialize(&argc, argv);
    benchmark::RunSpecifiedBenchmarks();
    benchmark::Shutdown();
    double difference = meanDifference(gDir + "/ours.jpg", gDir + "/vips.jpg");
    removeDir(gDir);

    if (gOurs.empty() || gVips.empty()) {
        fprintf(stderr, "bench_sepia_file: a side did not run; no ratio\n");
        return 1;
    }
    double ours = median(gOurs), vips = median(gVips);
    printf(
        "sepia_file %dx%d JPEG q%d: ours (processFilePath) %.1f ms, vips recomb %.1f ms "
        "(median of %d)\n",
        kWidth, kHeight, kQuality, ours * 1e3, vips * 1e3, kRuns);
    if (!gDecode.empty()) {
        printf(
            "  ours step by step: load as NV21 %.1f ms, doProcessNV21 %.1f ms, save JPEG %.1f ms\n",
            median(gDecode) * 1e3, median(gProcess) * 1e3, median(gEncode) * 1e3);
    }
    if (!gVipsStartup.empty()) {
        printf("  vips: of which about %.1f ms is process start-up (the same command on 16x16)\n",
               median(gVipsStartup) * 1e3);
    }
    printf("  ours vs vips output: mean |difference| %.2f of 255 per channel\n", difference);
    if (difference < 0 || difference > 6.0) {
        fprintf(stderr, "bench_sepia_file: the two outputs disagree; no ratio\n");
        return 1;
    }
    printf("ratio sepia_file ours/vips = %.2f (target <= 1.0)\n", ours / vips);
    return 0;
}
