// Colour conversion against libyuv and against a plain memcpy of the same
// output size, in one run, at 1920x1080 and 4000x3000. libyuv's names are
// little-endian words: its "ABGR" is R, G, B, A in memory (our "RGBA") and its
// "ARGB" is B, G, R, A (our "BGRA"). The YUV to RGB peers use libyuv's JPEG
// (full-range BT.601) constants, the equations ours implement.
#include <benchmark/benchmark.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include <initializer_list>
#include <map>
#include <memory>
#include <random>
#include <string>
#include <vector>

#include "vc_image_convert_fast.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_log.h"

#ifdef KIV_HAVE_LIBYUV
#include <libyuv.h>
#endif

namespace {

void silentLog(int, const char*, ...) {}

struct Case {
    const char* name;
    uint32_t from;
    uint32_t to;
};
const Case kCases[] = {
    {"NV21->RGBA", VC_FORMAT_NV21, VC_FORMAT_RGBA},
    {"RGBA->NV21", VC_FORMAT_RGBA, VC_FORMAT_NV21},
    {"NV12->RGBA", VC_FORMAT_NV12, VC_FORMAT_RGBA},
    {"RGBA->BGRA", VC_FORMAT_RGBA, VC_FORMAT_BGRA},
};
struct Size {
    int w, h;
};
const Size kSizes[] = {{1920, 1080}, {4000, 3000}};

// Source and destination images of one case and size, with random pixels.
struct Buffers {
    Buffers(const Case& c, Size s) {
        src = VCImage_createNew(s.w, s.h, c.from);
        dst = VCImage_createNew(s.w, s.h, c.to);
        copySrc.resize(dst->size);
        std::mt19937 rng(s.w + c.from);
        for (uint32_t i = 0; i < src->size; ++i) src->data[i] = static_cast<uint8_t>(rng());
        for (uint8_t& b : copySrc) b = static_cast<uint8_t>(rng());
    }
    ~Buffers() {
        VCImage_destroy(src);
        VCImage_destroy(dst);
    }
    VCImage* src;
    VCImage* dst;
    std::vector<uint8_t> copySrc;
};

std::string label(const Case& c, Size s, const char* who) {
    return std::string(c.name) + "/" + std::to_string(s.w) + "x" + std::to_string(s.h) + "/" + who;
}

// The vector path must give the reference loops' bytes.
bool bitExact(const Case& c, Size s) {
    Buffers b(c, s);
    VCImage* ref = VCImage_createNew(s.w, s.h, c.to);
    const int level = VCConvert_level();
    VCConvert_setLevel(kVCConvertScalar);
    VCImage_convert(b.src, ref);
    VCConvert_setLevel(level);
    VCImage_convert(b.src, b.dst);
    const bool same = memcmp(ref->data, b.dst->data, ref->size) == 0;
    VCImage_destroy(ref);
    return same;
}

void runOurs(benchmark::State& state, Case c, Size s) {
    Buffers b(c, s);
    for (auto _ : state) {
        if (VCImage_convert(b.src, b.dst) != VC_OK) state.SkipWithError("conversion failed");
        benchmark::DoNotOptimize(b.dst->data);
    }
}

void runMemcpy(benchmark::State& state, Case c, Size s) {
    Buffers b(c, s);
    for (auto _ : state) {
        memcpy(b.dst->data, b.copySrc.data(), b.dst->size);
        benchmark::DoNotOptimize(b.dst->data);
        benchmark::ClobberMemory();
    }
}

#ifdef KIV_HAVE_LIBYUV
void runLibyuv(benchmark::State& state, Case c, Size s) {
    Buffers b(c, s);
    const int w = s.w, h = s.h;
    uint8_t* in = b.src->data;
    uint8_t* out = b.dst->data;
    const size_t luma = static_cast<size_t>(w) * h;
    for (auto _ : state) {
        int r = -1;
        if (c.from == VC_FORMAT_NV21 && c.to == VC_FORMAT_RGBA)
            r = libyuv::NV21ToABGRMatrix(in, w, in + luma, w, out, w * 4,
                                         &libyuv::kYuvJPEGConstants, w, h);
        else if (c.from == VC_FORMAT_NV12 && c.to == VC_FORMAT_RGBA)
            r = libyuv::NV12ToABGRMatrix(in, w, in + luma, w, out, w * 4,
                                         &libyuv::kYuvJPEGConstants, w, h);
        else if (c.from == VC_FORMAT_RGBA && c.to == VC_FORMAT_NV21)
            r = libyuv::ABGRToNV21(in, w * 4, out, w, out + luma, w, w, h);
        else if (c.from == VC_FORMAT_RGBA && c.to == VC_FORMAT_BGRA)
            r = libyuv::ABGRToARGB(in, w * 4, out, w * 4, w, h);
        if (r != 0) state.SkipWithError("libyuv failed");
        benchmark::DoNotOptimize(out);
    }
}
#endif

// Console output as usual, plus the real time of every benchmark for the
// ratios: the median of the repetitions when there are some.
class RatioReporter : public benchmark::ConsoleReporter {
public:
    void ReportRuns(const std::vector<Run>& runs) override {
        for (const Run& run : runs) {
            if (run.error_occurred) continue;
            const std::string& name = run.run_name.function_name;
            if (run.run_type == Run::RT_Aggregate && run.aggregate_name == "median")
                mMedian[name] = run.GetAdjustedRealTime();
            else if (run.run_type == Run::RT_Iteration)
                mLast[name] = run.GetAdjustedRealTime();
        }
        ConsoleReporter::ReportRuns(runs);
    }
    double time(const std::string& name) const {
        auto it = mMedian.find(name);
        if (it != mMedian.end()) return it->second;
        it = mLast.find(name);
        return it == mLast.end() ? 0.0 : it->second;
    }

private:
    std::map<std::string, double> mMedian;
    std::map<std::string, double> mLast;
};

}  // namespace

int main(int argc, char** argv) {
    // (Pass any --benchmark_* flag to replace the defaults below.)
    VF_LogMsg = silentLog;  // the per-call debug line is not what is measured
    // KIV_BENCH_CONVERT_LEVEL=0/1/2 caps the vector level (scalar, SSE2, AVX2).
    const char* cap = getenv("KIV_BENCH_CONVERT_LEVEL");
    if (cap != nullptr) VCConvert_setLevel(atoi(cap));
    const char* levels[] = {"scalar", "SSE2", "AVX2"};
    printf("vector level: %s\n", levels[VCConvert_level()]);
    for (const Case& c : kCases)
        for (const Size& s : kSizes)
            printf("%-28s bit-exact with the reference loops: %s\n", label(c, s, "ours").c_str(),
                   bitExact(c, s) ? "yes" : "NO");

    for (const Case& c : kCases) {
        for (const Size& s : kSizes) {
            benchmark::RegisterBenchmark(label(c, s, "ours").c_str(), runOurs, c, s)
                ->Unit(benchmark::kMillisecond)
                ->UseRealTime();
#ifdef KIV_HAVE_LIBYUV
            benchmark::RegisterBenchmark(label(c, s, "libyuv").c_str(), runLibyuv, c, s)
                ->Unit(benchmark::kMillisecond)
                ->UseRealTime();
#endif
            benchmark::RegisterBenchmark(label(c, s, "memcpy").c_str(), runMemcpy, c, s)
                ->Unit(benchmark::kMillisecond)
                ->UseRealTime();
        }
    }
    // The machine is usually shared: by default repeat every benchmark,
    // interleave the repetitions at random and compare medians.
    std::vector<char*> args(argv, argv + argc);
    std::string reps = "--benchmark_repetitions=7";
    std::string interleave = "--benchmark_enable_random_interleaving=true";
    std::string minTime = "--benchmark_min_time=0.1";
    std::string aggregates = "--benchmark_report_aggregates_only=true";
    if (argc == 1) {
        for (std::string* a : {&reps, &interleave, &minTime, &aggregates}) args.push_back(&(*a)[0]);
    }
    int count = static_cast<int>(args.size());
    benchmark::Initialize(&count, args.data());
    RatioReporter reporter;
    benchmark::RunSpecifiedBenchmarks(&reporter);

    printf("\n%-12s %-10s %10s %10s %10s %12s %12s\n", "conversion", "size", "ours ms", "libyuv ms",
           "memcpy ms", "ours/libyuv", "ours/memcpy");
    for (const Case& c : kCases) {
        for (const Size& s : kSizes) {
            const double ours = reporter.time(label(c, s, "ours"));
            const double yuv = reporter.time(label(c, s, "libyuv"));
            const double copy = reporter.time(label(c, s, "memcpy"));
            const std::string size = std::to_string(s.w) + "x" + std::to_string(s.h);
            printf("%-12s %-10s %10.3f %10.3f %10.3f ", c.name, size.c_str(), ours, yuv, copy);
            if (ours > 0 && yuv > 0)
                printf("%12.2f ", ours / yuv);
            else
                printf("%12s ", "-");
            if (ours > 0 && copy > 0)
                printf("%12.2f\n", ours / copy);
            else
                printf("%12s\n", "-");
        }
    }
    benchmark::Shutdown();
    return 0;
}
