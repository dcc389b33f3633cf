// `kivimaging apply -e Sepia` as a user runs it, whole process, on a 12 MP
// and a 48 MP photo-like JPEG, against `vips recomb` with the same matrix and
// the same JPEG settings ([Q=98,subsample-mode=on]: quality 98, 4:2:0 as
// ours). Each side is a child process timed from fork to exit, its peak
// resident memory taken from the kernel's account of the child (ru_maxrss).
// The two sides alternate run by run so that load from elsewhere falls on
// both alike; medians and ranges are printed, and the ratios of the medians.
// KIV_APPLY_SIZES="WxH,..." replaces the sizes (e.g. a quick "1000x750").
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <android/log.h>

#include <algorithm>
#include <chrono>
#include <string>
#include <vector>

#include "file_bench.h"
#include "vccore/vc_log.h"

namespace {

using namespace filebench;

constexpr int kQuality = 98;

struct Run {
    double seconds = -1;
    long peakKb = 0;
};

// Runs argv as a child with its output silenced: wall time and peak RSS, or
// seconds < 0 when it failed or did not write `out`.
Run runChild(const std::vector<std::string>& args, const std::string& out) {
    unlink(out.c_str());
    std::vector<char*> argv;
    for (const std::string& a : args) argv.push_back(const_cast<char*>(a.c_str()));
    argv.push_back(nullptr);
    Run run;
    // The child's freopen would otherwise write our unflushed lines again.
    fflush(stdout);
    auto start = std::chrono::steady_clock::now();
    pid_t pid = fork();
    if (pid == 0) {
        freopen("/dev/null", "w", stdout);
        freopen("/dev/null", "w", stderr);
        execvp(argv[0], argv.data());
        _exit(127);
    }
    int status = 0;
    struct rusage usage;
    if (pid < 0 || wait4(pid, &status, 0, &usage) != pid) return run;
    auto stop = std::chrono::steady_clock::now();
    if (WIFEXITED(status) && WEXITSTATUS(status) == 0 && fileSize(out) > 0) {
        run.seconds = seconds(stop - start);
        run.peakKb = usage.ru_maxrss;
    }
    return run;
}

struct Side {
    std::vector<double> seconds;
    std::vector<double> peakMb;
};

void print(const char* who, const Side& side) {
    auto range = [](const std::vector<double>& v) {
        return std::make_pair(*std::min_element(v.begin(), v.end()),
                              *std::max_element(v.begin(), v.end()));
    };
    auto t = range(side.seconds);
    auto m = range(side.peakMb);
    printf("  %-5s %7.0f ms (%.0f-%.0f)   peak RSS %6.1f MB (%.1f-%.1f)\n", who,
           median(side.seconds) * 1e3, t.first * 1e3, t.second * 1e3, median(side.peakMb), m.first,
           m.second);
}

bool writeSepiaMatrix(const std::string& path) {
    FILE* f = fopen(path.c_str(), "w");
    if (f == nullptr) return false;
    fprintf(f, "3 3\n0.393 0.769 0.189\n0.349 0.686 0.168\n0.272 0.536 0.131\n");
    return fclose(f) == 0;
}

}  // namespace

int main() {
    quietHeadless();
    std::vector<std::pair<int, int>> sizes = {{4000, 3000}, {8000, 6000}};
    if (const char* env = getenv("KIV_APPLY_SIZES")) {
        sizes.clear();
        for (const char* p = env; *p != '\0';) {
            int w = 0, h = 0, n = 0;
            if (sscanf(p, "%dx%d%n", &w, &h, &n) != 2) break;
            sizes.push_back({w, h});
            p += n;
            if (*p == ',') ++p;
        }
    }
    const int runs = getenv("KIV_APPLY_RUNS") != nullptr ? atoi(getenv("KIV_APPLY_RUNS")) : 5;
    const std::string dir = makeTempDir("bench_apply_process");
    if (dir.empty() || !writeSepiaMatrix(dir + "/sepia.mat")) return 1;
    int failures = 0;
    for (auto [w, h] : sizes) {
        const std::string in = dir + "/in.jpg", ours = dir + "/ours.jpg", vips = dir + "/vips.jpg";
        if (!writeInput(in, w, h)) {
            fprintf(stderr, "bench_apply_process: cannot write a %dx%d input\n", w, h);
            return 1;
        }
        Side o, v;
        for (int i = 0; i < runs; ++i) {
            Run a = runChild({KIV_CLI, "apply", "-e", "Sepia", in, "-o", ours}, ours);
            Run b = runChild({"vips", "recomb", in,
                              vips + "[Q=" + std::to_string(kQuality) + ",subsample-mode=on]",
                              dir + "/sepia.mat"},
                             vips);
            if (a.seconds < 0 || b.seconds < 0) {
                fprintf(stderr, "bench_apply_process: %s failed at %dx%d\n",
                        a.seconds < 0 ? "kivimaging apply" : "vips recomb", w, h);
                failures++;
                break;
            }
            o.seconds.push_back(a.seconds);
            o.peakMb.push_back(a.peakKb / 1024.0);
            v.seconds.push_back(b.seconds);
            v.peakMb.push_back(b.peakKb / 1024.0);
        }
        if (o.seconds.empty()) continue;
        const double difference = meanDifference(ours, vips);
        printf(
            "apply_process %dx%d JPEG -> q%d 4:2:0 JPEG, Sepia, whole process (%zu runs each, "
            "alternated):\n",
            w, h, kQuality, o.seconds.size());
        print("ours", o);
        print("vips", v);
        printf("  ours vs vips output: mean |difference| %.2f of 255 per channel\n", difference);
        if (difference < 0 || difference > 6.0) {
            fprintf(stderr, "bench_apply_process: the two outputs disagree; no ratio\n");
            failures++;
            continue;
        }
        printf("ratio apply_process %dx%d time ours/vips = %.2f (target <= 0.8)\n", w, h,
               median(o.seconds) / median(v.seconds));
        printf("ratio apply_process %dx%d peak RSS ours/vips = %.2f (target <= 3)\n", w, h,
               median(o.peakMb) / median(v.peakMb));
    }
    removeDir(dir);
    return failures == 0 ? 0 : 1;
}
