// What every benchmark here shares: a quiet library log (per-call lines would
// be timed too), the headless GL platform, and the statistics they print.
#ifndef KIV_BENCH_BENCH_COMMON_H
#define KIV_BENCH_BENCH_COMMON_H

#include <stdlib.h>

#include <android/log.h>

#include <algorithm>
#include <chrono>
#include <vector>

#include "vccore/vc_log.h"

namespace kivbench {

inline void quietLog(int, const char*, ...) {}

// Library log lines off (errors still reach Android's log) and GL without a display.
inline void quietHeadless() {
    VF_LogMsg = quietLog;
    __android_log_set_minimum_priority(ANDROID_LOG_ERROR);
    if (getenv("EGL_PLATFORM") == nullptr) setenv("EGL_PLATFORM", "surfaceless", 0);
}

inline double median(std::vector<double> v) {
    std::sort(v.begin(), v.end());
    const size_t n = v.size();
    return n == 0 ? 0.0 : (n % 2 ? v[n / 2] : (v[n / 2 - 1] + v[n / 2]) / 2);
}

struct Spread {
    double median, low, high;
};

inline Spread spread(const std::vector<double>& v) {
    if (v.empty()) return {0.0, 0.0, 0.0};
    return {median(v), *std::min_element(v.begin(), v.end()),
            *std::max_element(v.begin(), v.end())};
}

inline double seconds(std::chrono::steady_clock::duration d) {
    return std::chrono::duration<double>(d).count();
}

inline double seconds(std::chrono::steady_clock::time_point a,
                      std::chrono::steady_clock::time_point b) {
    return seconds(b - a);
}

}  // namespace kivbench

#endif  // KIV_BENCH_BENCH_COMMON_H
