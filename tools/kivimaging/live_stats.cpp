#include "live_stats.h"

#include <stdio.h>

#include <algorithm>
#include <cmath>

namespace kivcli {

void LiveStats::add(uint64_t frameNumber, int64_t timestamp) {
    ++mFrames;
    // Frame skip + 1 is the first drawn at the paced rate after the others.
    if (mFrames > std::max<uint64_t>(mSkip, 1) && frameNumber == mLastNumber + 1) {
        mIntervals.push_back((double)(timestamp - mLastTimestamp) / 1e6);
    }
    mLastNumber = frameNumber;
    mLastTimestamp = timestamp;
}

double LiveStats::percentile(double p) const {
    if (mIntervals.empty()) return 0;
    std::vector<double> sorted = mIntervals;
    std::sort(sorted.begin(), sorted.end());
    size_t rank = (size_t)std::ceil(p / 100.0 * (double)sorted.size());
    rank = std::min(std::max(rank, (size_t)1), sorted.size());
    return sorted[rank - 1];
}

std::string liveSummary(uint64_t rendered, uint64_t dropped, double p50, double p99,
                        uint64_t recorded, const std::string& recording) {
    char line[512];
    int n = snprintf(line, sizeof(line),
                     "frames: %llu rendered, %llu dropped; interval p50 %.1f ms, p99 %.1f ms",
                     (unsigned long long)rendered, (unsigned long long)dropped, p50, p99);
    std::string text(line, (size_t)std::max(n, 0));
    if (!recording.empty()) {
        text += "; recorded " + std::to_string(recorded) + " frames to " + recording;
    }
    return text;
}

}  // namespace kivcli
