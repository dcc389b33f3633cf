// What 'kivimaging live' reports: the intervals between preview frames and
// its summary line.
#ifndef TOOLS_KIVIMAGING_LIVE_STATS_H
#define TOOLS_KIVIMAGING_LIVE_STATS_H

#include <stdint.h>

#include <string>
#include <vector>

namespace kivcli {

class LiveStats {
public:
    // Intervals begin with the one that ends frame skip + 1: the frames
    // before are drawn without pacing.
    explicit LiveStats(uint64_t skip) : mSkip(skip) {}

    // A preview frame: its number in the window's queue and its timestamp
    // (ns). Only frames that follow each other in the queue make an interval,
    // so a frame the window dropped before it was read adds none.
    void add(uint64_t frameNumber, int64_t timestamp);
    uint64_t frames() const { return mFrames; }
    // The p-th percentile (nearest rank) of the intervals in ms; 0 without any.
    double percentile(double p) const;

private:
    const uint64_t mSkip;
    uint64_t mFrames = 0;
    uint64_t mLastNumber = 0;
    int64_t mLastTimestamp = 0;
    std::vector<double> mIntervals;
};

// "frames: R rendered, D dropped; interval p50 X ms, p99 Y ms; recorded N
// frames to OUT.mp4" (the last clause only with a recording).
std::string liveSummary(uint64_t rendered, uint64_t dropped, double p50, double p99,
                        uint64_t recorded, const std::string& recording);

}  // namespace kivcli

#endif
