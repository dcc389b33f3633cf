// The live preview: the virtual camera's bars at 24 frames a second through
// the render manager into a preview window this program reads, for 20 s
// (KIV_BENCH_LIVE_SECONDS to try a shorter run), at 1280x720 and 1920x1080,
// with NoEffect and Sepia. It reports the frames rendered, the camera frames
// never rendered (dropped by the catch-up), the preview's frame intervals
// (p50, p99: between the times the frames' pixels were there, when a display
// could first show them, as the window notes them, not when this program's
// reader woke up, whose own scheduling delay is not the preview's cadence;
// a swap queues its frame while the GPU still draws it, as on a device, so
// the times the frames were queued, also reported, are the render thread's
// cadence without the draw's) and the CPU the render
// thread and the GL's rasteriser threads spend per frame. The peer is the
// bare GL work of one frame done directly on a thread of its own, fed by the
// same camera: latch (a GLConsumer), the same shader over a quad, and the
// swap into a window, a frame every 41 ms as the manager paces itself (on an
// absolute clock here, so with no drift and no overshoot to make up), each
// latching the camera's newest frame; its CPU per frame and its preview's
// intervals are measured the same way, in a run as long as ours after each
// of ours. Its intervals are what this machine's GL allows a preview paced
// that way: the period plus the spread of the GPU's time per frame.
#include <EGL/egl.h>
#include <GLES2/gl2.h>
#include <GLES2/gl2ext.h>
#include <benchmark/benchmark.h>
#include <dirent.h>
#include <pthread.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <time.h>

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <fstream>
#include <map>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include <gui/BufferQueue.h>
#include <gui/GLConsumer.h>
#include <gui/HostWindow.h>
#include <gui/Surface.h>

#include "bench_common.h"
#include "bench_gl.h"
#include "core/KivImaging.h"
#include "core/egl/EglEnvironment.h"
#include "core/egl/EglNativeSeam.h"
#include "core/egl/EglProgram.h"
#include "core/egl/OpenGLManagerThread.h"
#include "core/filters/sce/fixedLooks.h"
#include "kivhost/VirtualCamera.h"
#include "kivimaging/OpenGLManager.h"
#include "tools/kivimaging/live_stats.h"

namespace {

using namespace kivbench;
using android::sp;

constexpr int kFps = 24;
constexpr uint64_t kWarmUp = 11;  // the unpaced frames
constexpr long kPeriodNs = 41000000;  // the manager's pacing

struct Case {
    int width, height, effect;
    const char* name;
};
const Case kCases[] = {{1280, 720, 400, "NoEffect"},
                       {1280, 720, 401, "Sepia"},
                       {1920, 1080, 400, "NoEffect"},
                       {1920, 1080, 401, "Sepia"}};

struct Result {
    uint64_t rendered = 0, dropped = 0, bareFrames = 0;
    double p50 = 0, p99 = 0, queuedP50 = 0, queuedP99 = 0, oursCpuMs = 0, bareCpuMs = 0;
    double bareP50 = 0, bareP99 = 0;
    bool ok = false;
};
std::vector<Result> gResults(sizeof(kCases) / sizeof(kCases[0]));

int runSeconds() {
    const char* value = getenv("KIV_BENCH_LIVE_SECONDS");
    const int seconds = value != nullptr ? atoi(value) : 0;
    return seconds > 0 ? seconds : 20;
}

// CPU time (ns) of a thread of this process, from the scheduler's account.
uint64_t taskCpu(const std::string& tid) {
    std::ifstream in("/proc/self/task/" + tid + "/schedstat");
    uint64_t ns = 0;
    in >> ns;
    return ns;
}

std::string taskName(const std::string& tid) {
    std::ifstream in("/proc/self/task/" + tid + "/comm");
    std::string name;
    std::getline(in, name);
    return name;
}

// CPU of the GL's rasteriser threads plus that of one thread (by its CPU
// clock), so that GL work done off the drawing thread is counted too.
class CpuMeter {
public:
    explicit CpuMeter(pthread_t thread) : mThread(thread) {}
    void start() {
        mStart = rasteriser();
        mThreadStart = threadCpu();
    }
    double stopMs() const {
        return ((double)(rasteriser() - mStart) + (double)(threadCpu() - mThreadStart)) / 1e6;
    }

private:
    static uint64_t rasteriser() {
        uint64_t total = 0;
        DIR* dir = opendir("/proc/self/task");
        while (dirent* e = dir != nullptr ? readdir(dir) : nullptr) {
            if (e->d_name[0] == '.') continue;
            if (taskName(e->d_name).rfind("llvmpipe", 0) == 0) total += taskCpu(e->d_name);
        }
        if (dir != nullptr) closedir(dir);
        return total;
    }
    uint64_t threadCpu() const {
        clockid_t clock;
        timespec t{};
        if (pthread_getcpuclockid(mThread, &clock) != 0 || clock_gettime(clock, &t) != 0) return 0;
        return (uint64_t)t.tv_sec * 1000000000ull + t.tv_nsec;
    }
    pthread_t mThread;
    uint64_t mStart = 0, mThreadStart = 0;
};

// Reads a preview window's frames into `stats` (the times their pixels were
// there) and `queued` (the times they were queued) until `stop`; `onFrame`
// runs after each.
template <typename OnFrame>
void readPreview(android::HostWindow* preview, const std::atomic<bool>& stop,
                 kivcli::LiveStats* stats, kivcli::LiveStats* queued, OnFrame onFrame) {
    while (!stop.load()) {
        sp<android::GraphicBuffer> frame;
        uint64_t number = 0;
        int64_t timestamp = 0, ready = 0;
        while (preview->acquireFrame(&frame, &number, &timestamp, &ready) == android::NO_ERROR) {
            stats->add(number, ready);
            if (queued != nullptr) queued->add(number, timestamp);
            preview->releaseFrame(frame);
            onFrame();
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(2));
    }
}

// Ours: the manager, paced by itself, read here frame by frame.
void runOurs(const Case& c, int seconds, Result* r) {
    KivFilter* effect = KivImaging_create(c.effect, nullptr);
    KivImaging imaging(effect);
    kivhost::VirtualCamera camera(kivhost::VirtualCamera_generator(c.width, c.height), c.width,
                                  c.height);
    sp<android::HostWindow> preview = new android::HostWindow(c.width, c.height);
    sp<OpenGLManager> manager = new OpenGLManager(OPENGL_MANAGER_DIRECT, DISPLAY_DEVICE_GPU);
    manager->setCameraSize(c.width, c.height, 0, 0);
    manager->setPreviewWindow(preview, CAMERA_LAYOUT_SINGLE);
    manager->setFilter(&imaging);
    manager->startRenderThread();
    sp<ANativeWindow> window = manager->getNewPreviewWindowForOpenGL(0);
    if (window == nullptr || camera.connect(window) != 0) {
        manager->release();
        KivImaging_destroy(effect);
        return;
    }
    manager->notifyGLSurfaceConnectionComplete();
    camera.start(kFps);
    kivcli::LiveStats stats(kWarmUp), queued(kWarmUp);
    CpuMeter cpu(__atomic_load_n(&gOpenGLManagerThread, __ATOMIC_ACQUIRE));
    uint64_t sentAtStart = 0, renderedAtStart = 0;
    std::atomic<bool> stop(false);
    std::thread timer([&] {
        std::this_thread::sleep_for(std::chrono::seconds(seconds));
        stop = true;
    });
    readPreview(preview.get(), stop, &stats, &queued, [&] {
        if (stats.frames() == kWarmUp) {
            sentAtStart = camera.framesQueued() + camera.framesNotQueued();
            renderedAtStart = preview->queuedTotal();
            cpu = CpuMeter(__atomic_load_n(&gOpenGLManagerThread, __ATOMIC_ACQUIRE));
            cpu.start();
        }
    });
    timer.join();
    const double cpuMs = cpu.stopMs();
    camera.stop();
    const uint64_t sent = camera.framesQueued() + camera.framesNotQueued() - sentAtStart;
    r->rendered = preview->queuedTotal();
    const uint64_t paced = r->rendered - renderedAtStart;
    manager->release();
    camera.disconnect();
    KivImaging_destroy(effect);
    r->dropped = sent > paced ? sent - paced : 0;
    r->p50 = stats.percentile(50);
    r->p99 = stats.percentile(99);
    r->queuedP50 = queued.percentile(50);
    r->queuedP99 = queued.percentile(99);
    r->oursCpuMs = paced > 0 ? cpuMs / paced : 0;
    r->ok = stats.frames() > kWarmUp;
}

// Counts the camera's frames as they arrive.
class Arrivals : public android::ConsumerBase::FrameAvailableListener {
public:
    void onFrameAvailable(const android::BufferItem&) override {
        std::lock_guard<std::mutex> guard(mLock);
        ++mPending;
        mChanged.notify_one();
    }
    void onFrameReplaced(const android::BufferItem&) override {}
    bool take(std::chrono::steady_clock::time_point until) {
        std::unique_lock<std::mutex> lock(mLock);
        if (!mChanged.wait_until(lock, until, [&] { return mPending > 0; })) return false;
        --mPending;
        return true;
    }
    int takeAll() {
        std::lock_guard<std::mutex> guard(mLock);
        const int pending = mPending;
        mPending = 0;
        return pending;
    }

private:
    std::mutex mLock;
    std::condition_variable mChanged;
    int mPending = 0;
};

// The bare side: the same camera, latch, shader and swap with nothing around
// them, on a thread of its own; CPU per frame as for ours.
void runBare(const Case& c, int seconds, Result* r) {
    std::thread worker([&] {
        EglEnvironment env;
        if (env.initialize() != 0) return;
        EglNativeSeam& seam = EglNativeSeam::get();
        const EGLDisplay display = env.getEGLDisplay();
        sp<android::HostWindow> preview = new android::HostWindow(c.width, c.height);
        EGLSurface surface =
            seam.createWindowSurface(display, env.getEGLConfig(), preview.get(), nullptr);
        if (surface == EGL_NO_SURFACE ||
            seam.makeCurrent(display, &surface, env.getEGLContext()) != EGL_TRUE) {
            env.release();
            return;
        }
        GLuint texture = 0;
        glGenTextures(1, &texture);
        sp<android::IGraphicBufferProducer> producer;
        sp<android::IGraphicBufferConsumer> consumer;
        android::BufferQueue::createBufferQueue(&producer, &consumer);
        sp<android::GLConsumer> latch =
            new android::GLConsumer(consumer, texture, GL_TEXTURE_EXTERNAL_OES, true, false);
        sp<Arrivals> arrivals = new Arrivals();
        latch->setFrameAvailableListener(arrivals);
        sp<android::Surface> input = new android::Surface(producer, false);
        kivhost::VirtualCamera camera(kivhost::VirtualCamera_generator(c.width, c.height), c.width,
                                      c.height);
        Sepia sepia;
        char fragment[4096];
        if (c.effect == 401) {
            snprintf(fragment, sizeof(fragment), EglProgram::kBaseFragmentCode,
                     sepia.getFragmentShader());
        } else {
            snprintf(fragment, sizeof(fragment), "%s", EglProgram::kDefaultFragmentShader);
        }
        const GLuint program = quadProgram(fragment);
        if (program != 0 && camera.connect(input) == 0 && camera.start(kFps) == 0) {
            static const GLfloat uv[] = {0, 1, 1, 1, 0, 0, 1, 0};
            kivcli::LiveStats intervals(kWarmUp);
            std::atomic<bool> stop(false);
            std::thread reader(
                [&] { readPreview(preview.get(), stop, &intervals, nullptr, [] {}); });
            CpuMeter cpu(pthread_self());
            uint64_t frames = 0;
            const auto start = std::chrono::steady_clock::now();
            const auto end = start + std::chrono::seconds(seconds);
            // The camera's first frame starts the clock.
            bool running = arrivals->take(end);
            if (running) latch->updateTexImage();
            timespec next{};
            clock_gettime(CLOCK_MONOTONIC, &next);
            while (running && std::chrono::steady_clock::now() < end) {
                if (frames == kWarmUp) cpu.start();
                drawQuad(program, c.width, c.height, uv);
                if (seam.swapBuffers(display, &surface) != EGL_TRUE) break;
                ++frames;
                next.tv_nsec += kPeriodNs;
                if (next.tv_nsec >= 1000000000L) {
                    next.tv_nsec -= 1000000000L;
                    ++next.tv_sec;
                }
                clock_nanosleep(CLOCK_MONOTONIC, TIMER_ABSTIME, &next, nullptr);
                // The newest of the frames that came meanwhile.
                for (int n = arrivals->takeAll(); n > 0; --n) latch->updateTexImage();
            }
            if (frames > kWarmUp) {
                r->bareFrames = frames - kWarmUp;
                r->bareCpuMs = cpu.stopMs() / r->bareFrames;
            }
            camera.stop();
            stop = true;
            reader.join();
            r->bareP50 = intervals.percentile(50);
            r->bareP99 = intervals.percentile(99);
        }
        camera.disconnect();
        latch->abandon();
        glDeleteProgram(program);
        glDeleteTextures(1, &texture);
        eglMakeCurrent(display, EGL_NO_SURFACE, EGL_NO_SURFACE, EGL_NO_CONTEXT);
        seam.destroySurface(display, surface);
        env.release();
    });
    worker.join();
}

void BM_LivePreview(benchmark::State& state) {
    const Case& c = kCases[state.range(0)];
    Result& r = gResults[state.range(0)];
    const int seconds = runSeconds();
    for (auto _ : state) {
        runOurs(c, seconds, &r);
        runBare(c, seconds, &r);
        if (!r.ok || r.bareFrames == 0) state.SkipWithError("a side did not run");
    }
}

BENCHMARK(BM_LivePreview)->DenseRange(0, 3)->Iterations(1)->Unit(benchmark::kSecond)->UseRealTime();

}  // namespace

int main(int argc, char** argv) {
    quietHeadless();
    benchmark::Initialize(&argc, argv);
    benchmark::RunSpecifiedBenchmarks();
    benchmark::Shutdown();
    bool ok = true;
    for (size_t i = 0; i < gResults.size(); ++i) {
        const Case& c = kCases[i];
        const Result& r = gResults[i];
        if (r.rendered == 0 && r.bareFrames == 0) continue;  // not asked for
        if (!r.ok || r.bareFrames == 0) {
            ok = false;
            continue;
        }
        printf(
            "live_preview %dx%d %s at %d fps for %d s: %llu rendered, %llu dropped; interval p50 "
            "%.1f ms, p99 %.1f ms (pixels there; queued: p50 %.1f ms, p99 %.1f ms); render "
            "thread + rasteriser CPU %.2f ms/frame, bare latch + draw + swap %.2f ms/frame (%llu "
            "frames; its interval p50 %.1f ms, p99 %.1f ms)\n",
            c.width, c.height, c.name, kFps, runSeconds(), (unsigned long long)r.rendered,
            (unsigned long long)r.dropped, r.p50, r.p99, r.queuedP50, r.queuedP99, r.oursCpuMs,
            r.bareCpuMs, (unsigned long long)r.bareFrames, r.bareP50, r.bareP99);
        printf(
            "ratio live_preview %dx%d %s ours/bare = %.2f (target <= 1.2); p99 %.1f ms%s, bare "
            "p99 %.1f ms\n",
            c.width, c.height, c.name, r.oursCpuMs / r.bareCpuMs, r.p99,
            c.width == 1280 && c.effect == 401 ? " (target <= 43, 0 dropped)" : "", r.bareP99);
    }
    if (!ok) fprintf(stderr, "bench_live_preview: a case did not run\n");
    return ok ? 0 : 1;
}
