// An OnFrameListener that keeps a copy of every frame and error it is handed,
// with the thread that handed it, and lets a test wait for them.
#ifndef KIV_TESTS_FRAME_COLLECTOR_H
#define KIV_TESTS_FRAME_COLLECTOR_H

#include <pthread.h>
#include <stdint.h>

#include <condition_variable>
#include <mutex>
#include <string>
#include <vector>

#include "core/egl/ImageConverter.h"

struct CollectedFrame {
    int width;
    int height;
    uint32_t format;
    long long timestamp;
    std::vector<uint8_t> bytes;  // planes gathered tightly, as VCImage_clone lays them out
    pthread_t thread;
};

struct CollectedError {
    int code;
    std::string message;
    pthread_t thread;
};

class FrameCollector : public OnFrameListener {
public:
    explicit FrameCollector(uint32_t format = VC_FORMAT_NV21) : mFormat(format) {}
    void onFrameProcessed(const VCImage& image, long long timestamp) override;
    uint32_t getPreferredFormat() override { return mFormat; }
    void onProcessingError(int code, const char* message) override;

    // Waits until frames + errors reach events; false after a bound that
    // only a lost frame can exceed.
    bool waitFor(size_t events);
    std::vector<CollectedFrame> frames() const;
    std::vector<CollectedError> errors() const;

private:
    const uint32_t mFormat;
    mutable std::mutex mLock;
    std::condition_variable mChanged;
    std::vector<CollectedFrame> mFrames;
    std::vector<CollectedError> mErrors;
};

#endif
