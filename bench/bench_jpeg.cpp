// JPEG encoding and decoding of a 12-megapixel camera picture through the
// image core, against direct TurboJPEG calls with the same settings. Each
// iteration times both, in alternating order, so that load on the machine
// falls on both sides alike; the ratios (ours / TurboJPEG) are printed at the end.
#include <benchmark/benchmark.h>
#include <stdio.h>
#include <stdlib.h>
#include <turbojpeg.h>

#include <chrono>
#include <map>
#include <string>
#include <vector>

#include "bench_common.h"
#include "vc_image_codec.h"
#include "vccore/vc_file.h"
#include "vccore/vc_log.h"

namespace {

using namespace kivbench;

const int kWidth = 4000;
const int kHeight = 3000;
const int kQuality = 90;

// Smooth gradients with sensor-like noise, so the entropy coder has real work.
VCImage* cameraPicture() {
    VCImage* image = VCImage_createNew(kWidth, kHeight, VC_FORMAT_RGBA);
    uint32_t seed = 12345;
    unsigned char* p = image->data;
    for (int y = 0; y < kHeight; ++y)
        for (int x = 0; x < kWidth; ++x, p += 4) {
            seed = seed * 1664525u + 1013904223u;
            int noise = static_cast<int>((seed >> 24) & 15) - 8;
            int r = x * 255 / kWidth + noise;
            int g = y * 255 / kHeight + noise;
            int b = ((x / 97 + y / 61) % 2 ? 180 : 60) + noise;
            p[0] = static_cast<unsigned char>(r < 0 ? 0 : (r > 255 ? 255 : r));
            p[1] = static_cast<unsigned char>(g < 0 ? 0 : (g > 255 ? 255 : g));
            p[2] = static_cast<unsigned char>(b < 0 ? 0 : (b > 255 ? 255 : b));
            p[3] = 255;
        }
    return image;
}

struct Totals {
    double ours = 0;
    double peer = 0;
};
std::map<std::string, Totals> gTotals;

using Clock = std::chrono::steady_clock;

void report(benchmark::State& state, const char* name, double ours, double peer) {
    state.counters["ours_ms"] = benchmark::Counter(ours * 1e3 / state.iterations());
    state.counters["turbo_ms"] = benchmark::Counter(peer * 1e3 / state.iterations());
    state.counters["ratio"] = peer > 0 ? ours / peer : 0;
    Totals& t = gTotals[name];
    t.ours += ours;
    t.peer += peer;
}

void BM_JpegEncode(benchmark::State& state) {
    VCImage* image = cameraPicture();
    tjhandle tj = tjInitCompress();
    double ours = 0, peer = 0;
    int64_t i = 0;
    for (auto _ : state) {
        double before = ours;
        for (int side = 0; side < 2; ++side) {
            bool oursNow = (side == 0) == (i % 2 == 0);
            Clock::time_point start = Clock::now();
            if (oursNow) {
                VCImage* jpeg = VCImage_encodeToJpeg(image, kQuality);
                benchmark::DoNotOptimize(jpeg);
                VCImage_destroy(jpeg);
            } else {
                unsigned char* jpeg = nullptr;
                unsigned long size = 0;
                if (tjCompress2(tj, image->data, kWidth, kWidth * 4, kHeight, TJPF_RGBA, &jpeg,
                                &size, VC_JPEG_SUBSAMPLING, kQuality, VC_JPEG_ENCODE_FLAGS) != 0)
                    state.SkipWithError("tjCompress2 failed");
                benchmark::DoNotOptimize(jpeg);
                tjFree(jpeg);
            }
            (oursNow ? ours : peer) += seconds(start, Clock::now());
        }
        state.SetIterationTime(ours - before);  // the time column is ours
        ++i;
    }
    report(state, "encode", ours, peer);
    tjDestroy(tj);
    VCImage_destroy(image);
}

void BM_JpegDecode(benchmark::State& state) {
    VCImage* source = cameraPicture();
    VCImage* jpeg = VCImage_encodeToJpeg(source, kQuality);
    VCImage_destroy(source);
    if (jpeg == nullptr) {
        state.SkipWithError("encoding failed");
        return;
    }
    VCImage* image = VCImage_createNew(kWidth, kHeight, VC_FORMAT_RGBA);
    std::vector<unsigned char> pixels(static_cast<size_t>(kWidth) * kHeight * 4);
    tjhandle tj = tjInitDecompress();
    double ours = 0, peer = 0;
    int64_t i = 0;
    for (auto _ : state) {
        double before = ours;
        for (int side = 0; side < 2; ++side) {
            bool oursNow = (side == 0) == (i % 2 == 0);
            Clock::time_point start = Clock::now();
            if (oursNow) {
                if (VCImage_decodeFromJpeg(image, jpeg->data, static_cast<int>(jpeg->size)) != 0)
                    state.SkipWithError("VCImage_decodeFromJpeg failed");
            } else {
                int w = 0, h = 0, subsampling = 0, colorspace = 0;
                if (tjDecompressHeader3(tj, jpeg->data, jpeg->size, &w, &h, &subsampling,
                                        &colorspace) != 0 ||
                    tjDecompress2(tj, jpeg->data, jpeg->size, pixels.data(), w, w * 4, h, TJPF_RGBA,
                                  VC_JPEG_DECODE_FLAGS) != 0)
                    state.SkipWithError("TurboJPEG decoding failed");
            }
            benchmark::ClobberMemory();
            (oursNow ? ours : peer) += seconds(start, Clock::now());
        }
        state.SetIterationTime(ours - before);  // the time column is ours
        ++i;
    }
    report(state, "decode", ours, peer);
    tjDestroy(tj);
    VCImage_destroy(image);
    VCImage_destroy(jpeg);
}

BENCHMARK(BM_JpegEncode)->Unit(benchmark::kMillisecond)->Iterations(20)->UseManualTime();
BENCHMARK(BM_JpegDecode)->Unit(benchmark::kMillisecond)->Iterations(30)->UseManualTime();

}  // namespace

int main(int argc, char** argv) {
    VF_LogMsg = quietLog;
    benchmark::Initialize(&argc, argv);
    if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 1;
    benchmark::RunSpecifiedBenchmarks();
    benchmark::Shutdown();
    for (const auto& entry : gTotals)
        if (entry.second.peer > 0)
            printf("ratio %s %dx%d q%d (ours / TurboJPEG): %.3f\n", entry.first.c_str(), kWidth,
                   kHeight, kQuality, entry.second.ours / entry.second.peer);
    return 0;
}
