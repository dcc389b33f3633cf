// Helpers of the file-to-file benchmarks (a JPEG through an effect into a
// JPEG, against libvips' command line): the input picture, timing a peer
// command, comparing the two outputs, and the statistics they print.
#ifndef KIV_BENCH_FILE_BENCH_H
#define KIV_BENCH_FILE_BENCH_H

#include <stdio.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cmath>
#include <string>
#include <vector>

#include "bench_common.h"
#include "vccore/vc_file.h"
#include "vccore/vc_image.h"

namespace filebench {

using namespace kivbench;

inline long fileSize(const std::string& path) {
    struct stat st;
    return stat(path.c_str(), &st) == 0 ? static_cast<long>(st.st_size) : -1;
}

// Runs a shell command; its wall time in seconds when it succeeded and wrote
// `out`, else -1. `out` is removed first.
inline double timeCommand(const std::string& cmd, const std::string& out) {
    unlink(out.c_str());
    auto start = std::chrono::steady_clock::now();
    int rc = system(cmd.c_str());
    auto stop = std::chrono::steady_clock::now();
    return rc == 0 && fileSize(out) > 0 ? seconds(stop - start) : -1;
}

// Mean absolute difference per channel between two picture files, or -1.
// Both sides must have done the same work for a ratio to mean anything.
inline double meanDifference(const std::string& a, const std::string& b) {
    VCImage* x = VCImage_createEmpty(0, 0, VC_FORMAT_RGBA);
    VCImage* y = VCImage_createEmpty(0, 0, VC_FORMAT_RGBA);
    double mean = -1;
    if (VCImage_loadFromFile(x, a.c_str()) == VC_OK &&
        VCImage_loadFromFile(y, b.c_str()) == VC_OK && x->width == y->width &&
        x->height == y->height) {
        size_t pixels = static_cast<size_t>(x->width) * x->height;
        double sum = 0;
        for (size_t i = 0; i < pixels; i++) {
            for (int c = 0; c < 3; c++) sum += std::abs(x->data[i * 4 + c] - y->data[i * 4 + c]);
        }
        mean = sum / (pixels * 3.0);
    }
    VCImage_destroy(x);
    VCImage_destroy(y);
    return mean;
}

// A photo-like picture: smooth colour fields, soft circles and a little grain,
// so the codecs see realistic detail rather than flat areas or pure noise.
inline bool writeInput(const std::string& path, int width, int height) {
    VCImage* image = VCImage_createNew(width, height, VC_FORMAT_RGBA);
    if (image == nullptr) return false;
    uint32_t seed = 12345;
    for (int y = 0; y < height; y++) {
        for (int x = 0; x < width; x++) {
            double fx = static_cast<double>(x) / width, fy = static_cast<double>(y) / height;
            double ring = 0.5 + 0.5 * std::sin(std::hypot(fx - 0.4, fy - 0.6) * 40.0);
            seed = seed * 1664525u + 1013904223u;
            int grain = static_cast<int>((seed >> 24) % 17) - 8;
            uint8_t* p = image->data + (static_cast<size_t>(y) * width + x) * 4;
            p[0] = static_cast<uint8_t>(std::clamp(40 + 180 * fx + 30 * ring + grain, 0.0, 255.0));
            p[1] = static_cast<uint8_t>(std::clamp(60 + 120 * fy + 40 * ring + grain, 0.0, 255.0));
            p[2] = static_cast<uint8_t>(std::clamp(200 - 150 * fx * fy + grain, 0.0, 255.0));
            p[3] = 255;
        }
    }
    int rc = VCImage_saveToFile(image, path.c_str(), 90);
    VCImage_destroy(image);
    return rc == VC_OK && fileSize(path) > 0;
}

// A fresh temporary folder under `parent`, "" on failure.
inline std::string makeTempDir(const char* prefix, const char* parent = "/tmp") {
    std::string tmpl = std::string(parent) + "/" + prefix + "_XXXXXX";
    std::vector<char> buf(tmpl.begin(), tmpl.end());
    buf.push_back('\0');
    return mkdtemp(buf.data()) != nullptr ? std::string(buf.data()) : std::string();
}

inline void removeDir(const std::string& dir) {
    std::string cleanup = "rm -rf '" + dir + "'";
    int rc = system(cleanup.c_str());
    (void)rc;
}

}  // namespace filebench

#endif
