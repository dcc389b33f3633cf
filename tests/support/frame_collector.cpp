#include "support/frame_collector.h"

#include <chrono>

#include "support/image_ptr.h"

void FrameCollector::onFrameProcessed(const VCImage& image, long long timestamp) {
    ImagePtr copy(VCImage_clone(&image));
    CollectedFrame frame{image.width,
                         image.height,
                         image.format,
                         timestamp,
                         copy != nullptr ? VCImageTest_bytes(*copy) : std::vector<uint8_t>(),
                         pthread_self()};
    std::lock_guard<std::mutex> guard(mLock);
    mFrames.push_back(std::move(frame));
    mChanged.notify_all();
}

void FrameCollector::onProcessingError(int code, const char* message) {
    std::lock_guard<std::mutex> guard(mLock);
    mErrors.push_back({code, message != nullptr ? message : "(null)", pthread_self()});
    mChanged.notify_all();
}

bool FrameCollector::waitFor(size_t events) {
    std::unique_lock<std::mutex> guard(mLock);
    return mChanged.wait_for(guard, std::chrono::seconds(60),
                             [&] { return mFrames.size() + mErrors.size() >= events; });
}

std::vector<CollectedFrame> FrameCollector::frames() const {
    std::lock_guard<std::mutex> guard(mLock);
    return mFrames;
}

std::vector<CollectedError> FrameCollector::errors() const {
    std::lock_guard<std::mutex> guard(mLock);
    return mErrors;
}
