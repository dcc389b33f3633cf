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
// Two more lines say where an asynchronous frame's time goes: the same bands
// converted one band a thread on a fresh WorkQueue (how the converter cut
// frames before its threads shared out chunks of rows), and a breakdown of
// asynchronous frames from the converter's own log lines, stamped as they are
// issued (nothing formatted): the worker taking the frame, the first chunk
// of rows starting, the last chunk done and the frame posted, with how many
// threads and cores converted.
//
// Any --benchmark_* flag runs the same sides through Google Benchmark instead.
#include <benchmark/benchmark.h>
#include <sched.h>
#include <stdarg.h>
#include <stdio.h>
#include <string.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <condition_variable>
#include <functional>
#include <map>
#include <mutex>
#include <random>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "bench_common.h"
#include "core/egl/AsyncImageConverter.h"
#include "core/egl/WorkQueue.h"
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
        mPosted = Clock::now();
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
    Clock::time_point posted() {
        std::lock_guard<std::mutex> g(mLock);
        return mPosted;
    }

private:
    std::mutex mLock;
    std::condition_variable mChanged;
    long mFrames = 0;
    long mErrors = 0;
    int mLastFirstByte = 0;
    Clock::time_point mPosted;
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

// The picture cut into count equal bands, as views of the source and of the
// single-threaded sides' target; a band's chroma rows stay where the whole
// frame has them.
struct BandViews {
    BandViews(Setup& s, int count) {
        const int w = s.width, h = s.height, rows = h / count;
        for (int i = 0; i < count; ++i) {
            sources.push_back(VCImage_createWrap(s.source->data + i * rows * w * 4, w, rows,
                                                 VC_FORMAT_RGBA, 0, 0));
            const uint32_t uv = static_cast<uint32_t>(w * h + i * (rows / 2) * w - i * rows * w);
            targets.push_back(
                VCImage_createWrap(s.target->data + i * rows * w, w, rows, VC_FORMAT_NV21, 0, uv));
        }
    }
    ~BandViews() {
        for (VCImage* v : sources) VCImage_destroy(v);
        for (VCImage* v : targets) VCImage_destroy(v);
    }
    std::vector<VCImage*> sources, targets;
};

// The same conversion split in two halves on two threads that live across
// runs (one wake-up a run, no thread made, no queue): what splitting the work
// across the cores gains at best here, the bound under the converter's bands.
class Halves {
public:
    explicit Halves(Setup& s) : mSetup(s), mBands(s, 2) {
        mHelper = std::thread([this] {
            long seen = 0;
            for (;;) {
                {
                    std::unique_lock<std::mutex> g(mLock);
                    mChanged.wait(g, [&] { return mQuit || mRun != seen; });
                    if (mQuit) return;
                    seen = mRun;
                }
                const int status = VCImage_convert(mBands.sources[1], mBands.targets[1]);
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
    }
    double run() {
        const Clock::time_point t0 = Clock::now();
        long run;
        {
            std::lock_guard<std::mutex> g(mLock);
            run = ++mRun;
            mChanged.notify_all();
        }
        const int status = VCImage_convert(mBands.sources[0], mBands.targets[0]);
        std::unique_lock<std::mutex> g(mLock);
        mChanged.wait(g, [&] { return mDone == run; });
        const Clock::time_point t1 = Clock::now();
        mSetup.ok = mSetup.ok && status == VC_OK && mStatus == VC_OK;
        return seconds(t0, t1);
    }

private:
    Setup& mSetup;
    BandViews mBands;
    std::mutex mLock;
    std::condition_variable mChanged;
    long mRun = 0, mDone = 0;
    int mStatus = VC_OK;
    bool mQuit = false;
    std::thread mHelper;
};

// The frame cut as the converter cuts it (four bands when the height is a
// multiple of 8) and converted one band a thread on a fresh four-thread
// WorkQueue, as the converter did before its threads shared out chunks.
class FixedBands {
public:
    explicit FixedBands(Setup& s) : mSetup(s), mBands(s, 4) {}
    double run() {
        const Clock::time_point t0 = Clock::now();
        int statuses[4] = {-1, -1, -1, -1};
        {
            android::WorkQueue queue(4, true);
            for (int i = 0; i < 4; ++i)
                mSetup.ok = mSetup.ok && queue.schedule(new Band(mBands.sources[i],
                                                                 mBands.targets[i], &statuses[i]),
                                                        2) == 0;
            queue.finish();
        }
        const Clock::time_point t1 = Clock::now();
        for (int status : statuses) mSetup.ok = mSetup.ok && status == VC_OK;
        return seconds(t0, t1);
    }

private:
    class Band : public android::WorkQueue::WorkUnit {
    public:
        Band(VCImage* s, VCImage* d, int* status) : mS(s), mD(d), mStatus(status) {}
        bool run() override {
            *mStatus = VCImage_convert(mS, mD);
            return true;
        }

    private:
        VCImage *mS, *mD;
        int* mStatus;
    };
    Setup& mSetup;
    BandViews mBands;
};

// The converter's log lines of one asynchronous frame, stamped as they are
// issued: the worker probing for the external converter (it has taken the
// frame), each chunk's VCImage_convert starting (with its thread and core),
// and the slice path done. Only the format is looked at.
class Stamps {
public:
    enum Kind { kTaken, kChunk, kSliced };
    struct Event {
        Clock::time_point t;
        Kind kind;
        pid_t thread;
        int cpu;
    };
    static void log(int, const char* format, ...) {
        Kind kind;
        if (strcmp(format, "%s: %dx%d %4.4s --> %4.4s") == 0) {
            kind = kTaken;
        } else if (strncmp(format, "[VCImage] Converting from", 25) == 0) {
            kind = kChunk;
        } else if (strcmp(format, "%s") == 0) {
            va_list args;
            va_start(args, format);
            const char* line = va_arg(args, const char*);
            va_end(args);
            if (strncmp(line, "[Async/Slices]", 14) != 0) return;
            kind = kSliced;
        } else {
            return;
        }
        const int i = sCount.fetch_add(1);
        if (i < kMax) sEvents[i] = {Clock::now(), kind, gettid(), sched_getcpu()};
    }
    static void reset() { sCount = 0; }
    static std::vector<Event> events() {
        return std::vector<Event>(sEvents, sEvents + std::min(sCount.load(), kMax));
    }

private:
    static constexpr int kMax = 256;
    static Event sEvents[kMax];
    static std::atomic<int> sCount;
};
Stamps::Event Stamps::sEvents[Stamps::kMax];
std::atomic<int> Stamps::sCount{0};

// Asynchronous frames taken apart from their stamps; medians over frames.
void printBreakdown(Setup& big, int frames) {
    VF_LogMsg = Stamps::log;
    std::vector<double> taken, first, converting, posted, woken, whole, threads, cores, busiest;
    for (int f = 0; f < frames; ++f) {
        VCImage* copy = VCImage_clone(big.source);
        Stamps::reset();
        const Clock::time_point t0 = Clock::now();
        big.ok = big.ok && big.converter->convertAndPost(copy, big.listener, f, true) == 0;
        big.listener.waitFor(++big.posted);
        const Clock::time_point t3 = Clock::now();
        const std::vector<Stamps::Event> events = Stamps::events();
        Clock::time_point tTaken{}, tFirst = Clock::time_point::max(), tSliced{};
        std::set<pid_t> tids;
        std::map<int, int> perCpu;  // chunks started on each core
        int chunks = 0;
        for (const Stamps::Event& e : events) {
            if (e.kind == Stamps::kTaken) tTaken = e.t;
            if (e.kind == Stamps::kSliced) tSliced = e.t;
            if (e.kind != Stamps::kChunk) continue;
            tFirst = std::min(tFirst, e.t);
            tids.insert(e.thread);
            ++perCpu[e.cpu];
            ++chunks;
        }
        if (tids.empty() || tTaken == Clock::time_point{} || tSliced == Clock::time_point{}) {
            big.ok = false;
            break;
        }
        taken.push_back(seconds(t0, tTaken));
        first.push_back(seconds(tTaken, tFirst));
        converting.push_back(seconds(tFirst, tSliced));
        posted.push_back(seconds(tSliced, big.listener.posted()));
        woken.push_back(seconds(big.listener.posted(), t3));
        whole.push_back(seconds(t0, t3));
        threads.push_back(static_cast<double>(tids.size()));
        cores.push_back(static_cast<double>(perCpu.size()));
        int most = 0;
        for (const auto& c : perCpu) most = std::max(most, c.second);
        busiest.push_back(static_cast<double>(most) / chunks);
    }
    VF_LogMsg = quietLog;
    printf(
        "  async 4000x3000 frame taken apart (medians of %d frames, ms): worker takes it %.3f, "
        "first chunk starts %.3f later, chunks to bands joined %.3f, to the listener %.3f, "
        "caller woken %.3f; whole %.3f; %.0f threads converted on %.0f cores, the busiest core "
        "starting %.0f%% of the chunks\n",
        frames, median(taken) * 1e3, median(first) * 1e3, median(converting) * 1e3,
        median(posted) * 1e3, median(woken) * 1e3, median(whole) * 1e3, median(threads),
        median(cores), median(busiest) * 100);
}

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
        FixedBands fixed(big);
        // The halves' bands must make the whole frame's bytes, or their time means nothing.
        halves.run();
        VCImage* whole = VCImage_createNew(big.width, big.height, VC_FORMAT_NV21);
        ok = ok && whole != nullptr && VCImage_convert(big.source, whole) == VC_OK &&
             memcmp(whole->data, big.target->data, whole->size) == 0;
        VCImage_destroy(whole);
        std::vector<std::function<double()>> sides = {
            [&] { return big.single(); }, [&] { return big.async(); }, [&] { return halves.run(); },
            [&] { return fixed.run(); }};
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
        const Spread yuv = spread(m[4]);
        const Spread ry = spread(ratios(m[1], m[4]));
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
        const Spread rf = spread(ratios(m[3], m[0]));
        printf(
            "  one band a thread on a fresh four-thread WorkQueue, against one: %.2f (range "
            "%.2f-%.2f)\n",
            rf.median, rf.low, rf.high);
        printBreakdown(big, 20);
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
