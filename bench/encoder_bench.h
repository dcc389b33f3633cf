// The two sides of the video encoder benchmarks: RGBA frames encoded to an
// MP4 by the host video encoder (queued into its buffer queue as fast as it
// takes them, with room for all, until close() returns with the file
// written), and by the ffmpeg program with the same libx264 preset, quality
// and threads, the frames piped in from memory (its start-up included).
#ifndef KIV_BENCH_ENCODER_BENCH_H
#define KIV_BENCH_ENCODER_BENCH_H

#include <stdio.h>

#include <algorithm>
#include <chrono>
#include <string>
#include <vector>

#include <gui/Surface.h>

#include "kivhost/VideoEncoder.h"

using EncoderBenchFrames = std::vector<std::vector<unsigned char>>;

inline kivhost::VideoEncoderSettings EncoderBench_settings(int width, int height, int count) {
    kivhost::VideoEncoderSettings s;
    s.width = width;
    s.height = height;
    s.backlog = count;
    return s;
}

// `count` frames (the list over and over) through the host encoder: false
// when a frame was dropped or anything failed; the wall time per frame.
inline bool EncoderBench_ours(const EncoderBenchFrames& frames, int width, int height, int count,
                              const std::string& path, double* msPerFrame) {
    const auto start = std::chrono::steady_clock::now();
    auto encoder = kivhost::VideoEncoder::open(path, EncoderBench_settings(width, height, count));
    if (encoder == nullptr) return false;
    android::sp<android::Surface> surface = new android::Surface(encoder->getProducer());
    ANativeWindow* window = surface.get();
    native_window_api_connect(window, NATIVE_WINDOW_API_CPU);
    native_window_set_usage(window, android::GraphicBuffer::USAGE_SW_WRITE_OFTEN);
    for (int i = 0; i < count; ++i) {
        ANativeWindowBuffer* native = nullptr;
        int fence = -1;
        if (window->dequeueBuffer(window, &native, &fence) != 0) return false;
        android::GraphicBuffer* buffer = android::GraphicBuffer::from(native);
        void* pixels = nullptr;
        if (buffer->getStride() != (uint32_t)width ||
            buffer->lock(android::GraphicBuffer::USAGE_SW_WRITE_OFTEN, &pixels) != 0) {
            return false;
        }
        const std::vector<unsigned char>& frame = frames[i % frames.size()];
        std::copy(frame.begin(), frame.end(), static_cast<unsigned char*>(pixels));
        buffer->unlock();
        native_window_set_buffers_timestamp(window, (int64_t)i * 1000000000LL / 24);
        if (window->queueBuffer(window, native, -1) != 0) return false;
    }
    if (encoder->close() != 0) return false;
    const double seconds =
        std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
    *msPerFrame = seconds * 1e3 / count;
    const kivhost::VideoEncoderStats stats = encoder->stats();
    return stats.encoded == (uint64_t)count && stats.dropped == 0;
}

inline bool EncoderBench_ffmpeg(const EncoderBenchFrames& frames, int width, int height, int count,
                                const std::string& path, double* msPerFrame) {
    const kivhost::VideoEncoderSettings s = EncoderBench_settings(width, height, count);
    char command[512];
    snprintf(command, sizeof(command),
             "ffmpeg -v error -y -f rawvideo -pix_fmt rgba -s %dx%d -r 24 -i - -c:v libx264 "
             "-preset %s -crf %d -threads %d -pix_fmt yuv420p %s",
             width, height, s.preset.c_str(), s.crf, s.threads, path.c_str());
    const auto start = std::chrono::steady_clock::now();
    FILE* pipe = popen(command, "w");
    if (pipe == nullptr) return false;
    bool ok = true;
    for (int i = 0; i < count && ok; ++i) {
        const std::vector<unsigned char>& frame = frames[i % frames.size()];
        ok = fwrite(frame.data(), 1, frame.size(), pipe) == frame.size();
    }
    ok = pclose(pipe) == 0 && ok;
    const double seconds =
        std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
    *msPerFrame = seconds * 1e3 / count;
    return ok;
}

inline double EncoderBench_median(std::vector<double> v) {
    std::sort(v.begin(), v.end());
    return v.empty() ? 0.0 : v[v.size() / 2];
}

#endif
