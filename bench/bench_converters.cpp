// The asynchronous frame converter end to end (convertAndPost to the
// listener's call, the sliced conversion on the worker) against one thread of
// the image core's VCImage_convert and against libyuv's single-threaded
// ABGRToNV21, RGBA to NV21 at 4000x3000; and, at 1280x720, what a frame costs
// the calling thread (convertAndPost with ownership handed over) and end to
// end against one thread.
//
// Paired rounds as in bench_convert: every round times a block of runs of each
// side in a rotating order, so that load from other processes hits all sides
// alike; the ratio quoted is the median over the rounds of the per-round
// ratio of block minima, with its range. The asynchronous side gets a fresh
// owned copy of the picture before each run, outside the timing, as a
// renderer hands over its read-back.
//
// The conversion is bound by memory traffic, not arithmetic: the program
// also prints how much faster two threads copy memory than one, and how much
// faster the conversion itself runs split in halves on two threads kept from
// run to run (the most any split of the work across cores can gain on the
// machine it runs on, before the converter's own threads and hand-overs).
//
// Any --benchmark_* flag runs the same sides through Google Benchmark instead.
#include <benchmark/benchmark.h>
#include <stdio.h>
#include <string.h>

#include <algorithm>
#include <chrono>
#include <condition_variable>
#include <functional>
#include <mutex>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include "bench_common.h"
#include "core/egl/AsyncImageConverter.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_log.h"

#ifdef KIV_HAVE_LIBYUV
#include <libyuv.h>
#endif

namespace {

using namespace kivbench;

using Clock = std::chrono::steady_clock;

// Counts the frames it is handed and lets the bench wait for the next one.
class WaitingListener : public OnFrameListener {
public:
    void onFrameProcessed(const VCImage& image, long long) override {
        std::lock_guard<std::mutex> g(mLock);
        mLastFirstByte = image.data[0];
        ++mFrames;
        mChanged.notify_all();
    }
    void onProcessingError(int, const char*) override {
        std::lock_guard<std::mutex> g(mLock);
        ++mErrors;
        ++mFrames;
        mChanged.notify_all();
    }
    void waitFor(long frames) {
        std::unique_lock<std::mutex> g(mLock);
        mChanged.wait(g, [&] { return mFrames >= frames; });
    }
    long errors() {
        std::lock_guard<std::mutex> g(mLock);
        return mErrors;
    }

private:
    std::mutex mLock;
    std::condition_variable mChanged;
    long mFrames = 0;
    long mErrors = 0;
    int mLastFirstByte = 0;
};

// One picture size: the RGBA source, a preallocated NV21 target for the
// single-threaded sides, and the asynchronous converter with its listener.
struct Setup {
    Setup(int w, int h) : width(w), height(h) {
        source = VCImage_createNew(w, h, VC_FORMAT_RGBA);
        target = VCImage_createNew(w, h, VC_FORMAT_NV21);
        std::mt19937 rng(w);
        for (uint32_t i = 0; i < source->size; ++i) source->data[i] = static_cast<uint8_t>(rng());
        memset(target->data, 0, target->size);
        converter = new AsyncImageConverter(1);
    }
    ~Setup() {
        converter.clear();
        VCImage_destroy(source);
        VCImage_destroy(target);
    }
    double single() {
        const Clock::time_point t0 = Clock::now();
        const int status = VCImage_convert(source, target);
        const Clock::time_point t1 = Clock::now();
        ok = ok && status == VC_OK;
        return seconds(t0, t1);
    }
#ifdef KIV_HAVE_LIBYUV
    double libyuv() {
        const int luma = width * height;
        const Clock::time_point t0 = Clock::now();
        const int r = libyuv::ABGRToNV21(source->data, width * 4, target->data, width,
                                         target->data + luma, width, width, height);
        const Clock::time_point t1 = Clock::now();
        ok = ok && r == 0;
        return seconds(t0, t1);
    }
#endif
    // Schedule to listener; *callerTime gets how long convertAndPost held
    // the caller.
    double async(double* callerTime = nullptr) {
        VCImage* copy = VCImage_clone(source);
        const Clock::time_point t0 = Clock::now();
        const int status = converter->convertAndPost(copy, listener, posted, true);
        const Clock::time_point t1 = Clock::now();
        listener.waitFor(++posted);
        const Clock::time_point t2 = Clock::now();
        ok = ok && status == 0 && listener.errors() == 0;
        if (callerTime != nullptr) *callerTime = seconds(t0, t1);
        return seconds(t0, t2);
    }
    int width, height;
    VCImage* source;
    VCImage* target;
    android::sp<AsyncImageConverter> converter;
    WaitingListener listener;
    long posted = 0;
    bool ok = true;
};

// The same conversion split in two halves on two threads that live across
// runs (one wake-up a run, no thread made, no queue): what splitting the work
// across the cores gains at best here, the bound under the converter's bands.
class Halves {
public:
    explicit Halves(Setup& s) : mSetup(s) {
        const int w = s.width, h = s.height, half = h / 2;
        for (int i = 0; i < 2; ++i) {
            mSources[i] = VCImage_createWrap(s.source->data + i * half * w * 4, w, half,
                                             VC_FORMAT_RGBA, 0, 0);
            // The band's chroma rows stay where the whole frame has them.
            const uint32_t uv = static_cast<uint32_t>(w * h + i * (half / 2) * w - i * half * w);
            mTargets[i] =
                VCImage_createWrap(s.target->data + i * half * w, w, half, VC_FORMAT_NV21, 0, uv);
        }
        mHelper = std::thread([this] {
            long seen = 0;
            for (;;) {
                {
                    std::unique_lock<std::mutex> g(mLock);
                    mChanged.wait(g, [&] { return mQuit || mRun != seen; });
                    if (mQuit) return;
                    seen = mRun;
                }
                const int status = VCImage_convert(mSources[1], mTargets[1]);
                std::lock_guard<std::mutex> g(mLock);
                mStatus = status;
                mDone = seen;
                mChanged.notify_all();
            }
        });
    }
    ~Halves() {
        {
            std::lock_guard<std::mutex> g(mLock);
            mQuit = true;
            mChanged.notify_all();
        }
        mHelper.join();
        for (int i = 0; i < 2; ++i) {
            VCImage_destroy(mSources[i]);
            VCImage_destroy(mTargets[i]);
        }
    }
    double run() {
        const Clock::time_point t0 = Clock::now();
        long run;
        {
            std::lock_guard<std::mutex> g(mLock);
            run = ++mRun;
            mChanged.notify_all();
        }
        const int status = VCImage_convert(mSources[0], mTargets[0]);
        std::unique_lock<std::mutex> g(mLock);
        mChanged.wait(g, [&] { return mDone == run; });
        const Clock::time_point t1 = Clock::now();
        mSetup.ok = mSetup.ok && status == VC_OK && mStatus == VC_OK;
        return seconds(t0, t1);
    }

private:
    Setup& mSetup;
    VCImage* mSources[2];
    VCImage* mTargets[2];
    std::mutex mLock;
    std::condition_variable mChanged;
    long mRun = 0, mDone = 0;
    int mStatus = VC_OK;
    bool mQuit = false;
    std::thread mHelper;
};

// Rounds of blocks of runs, sides in a rotating order; per side the block
// minima of every round.
std::vector<std::vector<double>> pairedRounds(const std::vector<std::function<double()>>& sides,
                                              int rounds, int block) {
    std::vector<std::vector<double>> minima(sides.size());
    for (int round = 0; round < rounds; ++round) {
        for (size_t k = 0; k < sides.size(); ++k) {
            const size_t side = (round + k) % sides.size();
            double best = 1e9;
            for (int i = 0; i < block; ++i) best = std::min(best, sides[side]());
            minima[side].push_back(best);
        }
    }
    return minima;
}

std::vector<double> ratios(const std::vector<double>& a, const std::vector<double>& b) {
    std::vector<double> r;
    for (size_t i = 0; i < a.size(); ++i) r.push_back(a[i] / b[i]);
    return r;
}

// Copy throughput of one thread against two, over buffers of the picture's
// size: the ceiling of a parallel speed-up for memory-bound work.
Spread copyCeiling() {
    const size_t n = 4000u * 3000u * 4u;
    std::vector<uint8_t> a(n, 1), b(n, 2);
    auto one = [&] {
        const Clock::time_point t0 = Clock::now();
        memcpy(b.data(), a.data(), n);
        return seconds(t0, Clock::now());
    };
    auto two = [&] {
        const Clock::time_point t0 = Clock::now();
        std::thread other([&] { memcpy(b.data(), a.data(), n / 2); });
        memcpy(b.data() + n / 2, a.data() + n / 2, n - n / 2);
        other.join();
        return seconds(t0, Clock::now());
    };
    const auto m = pairedRounds({one, two}, 8, 4);
    return spread(ratios(m[1], m[0]));
}

void registerAll() {
    static Setup big(4000, 3000);
    auto add = [](const char* name, std::function<double()> side) {
        benchmark::RegisterBenchmark(name,
                                     [side](benchmark::State& state) {
                                         for (auto _ : state) state.SetIterationTime(side());
                                     })
            ->Unit(benchmark::kMillisecond)
            ->UseManualTime();
    };
    add("RGBA->NV21/4000x3000/single", [] { return big.single(); });
#ifdef KIV_HAVE_LIBYUV
    add("RGBA->NV21/4000x3000/libyuv", [] { return big.libyuv(); });
#endif
    add("RGBA->NV21/4000x3000/async", [] { return big.async(); });
}

}  // namespace

int main(int argc, char** argv) {
    VF_LogMsg = quietLog;  // the converters' per-frame lines are not what is measured
    if (argc > 1) {
        registerAll();
        benchmark::Initialize(&argc, argv);
        if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 1;
        benchmark::RunSpecifiedBenchmarks();
        benchmark::Shutdown();
        return 0;
    }

    bool ok = true;
    {
        Setup big(4000, 3000);
        Halves halves(big);
        // The halves' bands must make the whole frame's bytes, or their time means nothing.
        halves.run();
        VCImage* whole = VCImage_createNew(big.width, big.height, VC_FORMAT_NV21);
        ok = ok && whole != nullptr && VCImage_convert(big.source, whole) == VC_OK &&
             memcmp(whole->data, big.target->data, whole->size) == 0;
        VCImage_destroy(whole);
        std::vector<std::function<double()>> sides = {[&] { return big.single(); },
                                                      [&] { return big.async(); },
                                                      [&] { return halves.run(); }};
#ifdef KIV_HAVE_LIBYUV
        sides.push_back([&] { return big.libyuv(); });
#endif
        const auto m = pairedRounds(sides, 12, 4);
        const Spread single = spread(m[0]), async = spread(m[1]);
        const Spread r = spread(ratios(m[1], m[0]));
        printf("RGBA->NV21 4000x3000, 12 rounds of 4 runs a side (medians of block minima)\n");
        printf("  single-threaded VCImage_convert %8.2f ms (%.2f-%.2f)\n", single.median * 1e3,
               single.low * 1e3, single.high * 1e3);
        printf("  async end to end                %8.2f ms (%.2f-%.2f)\n", async.median * 1e3,
               async.low * 1e3, async.high * 1e3);
#ifdef KIV_HAVE_LIBYUV
        const Spread yuv = spread(m[3]);
        const Spread ry = spread(ratios(m[1], m[3]));
        printf("  libyuv ABGRToNV21 single thread %8.2f ms (%.2f-%.2f)\n", yuv.median * 1e3,
               yuv.low * 1e3, yuv.high * 1e3);
#endif
        printf("ratio converters async/single 4000x3000 = %.2f (range %.2f-%.2f; target <= 0.6)\n",
               r.median, r.low, r.high);
#ifdef KIV_HAVE_LIBYUV
        printf("ratio converters async/libyuv 4000x3000 = %.2f (range %.2f-%.2f)\n", ry.median,
               ry.low, ry.high);
#endif
        const Spread rh = spread(ratios(m[2], m[0]));
        printf("  two threads made once converting halves, against one: %.2f (range %.2f-%.2f)\n",
               rh.median, rh.low, rh.high);
        ok = ok && big.ok;
        const Spread ceiling = copyCeiling();
        printf("  memcpy of 48 MB, two threads against one: %.2f (range %.2f-%.2f)\n",
               ceiling.median, ceiling.low, ceiling.high);
    }
    {
        Setup hd(1280, 720);
        std::vector<double> caller;
        std::vector<std::function<double()>> sides = {[&] { return hd.single(); },
                                                      [&] {
                                                          double c = 0;
                                                          const double t = hd.async(&c);
                                                          caller.push_back(c);
                                                          return t;
                                                      }};
        const auto m = pairedRounds(sides, 15, 10);
        const Spread c = spread(caller);
        const Spread r = spread(ratios(m[1], m[0]));
        printf("RGBA->NV21 1280x720, 15 rounds of 10 runs a side\n");
        printf("  single-threaded %.3f ms, async end to end %.3f ms (medians of block minima)\n",
               median(m[0]) * 1e3, median(m[1]) * 1e3);
        printf("ratio converters async/single 1280x720 = %.2f (range %.2f-%.2f)\n", r.median, r.low,
               r.high);
        printf(
            "converters schedule 1280x720: convertAndPost holds the caller %.4f ms (median of %zu, "
            "range %.4f-%.4f; target <= 0.1)\n",
            c.median * 1e3, caller.size(), c.low * 1e3, c.high * 1e3);
        ok = ok && hd.ok;
    }
    if (!ok) {
        fprintf(stderr, "bench_converters: a conversion failed\n");
        return 1;
    }
    return 0;
}
