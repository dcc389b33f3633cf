#include "kivhost/VirtualCamera.h"

#include <string.h>

#include <chrono>

#include <ui/GraphicBuffer.h>
#include <utils/Errors.h>

#include "core/egl/EglClock.h"
#include "kivhost/BackgroundThread.h"
#include "vccore/vc_log.h"

namespace kivhost {

using android::GraphicBuffer;

VirtualCamera::VirtualCamera(std::unique_ptr<VirtualCameraSource> source, int width, int height)
    : mSource(std::move(source)), mWidth(width), mHeight(height) {}

VirtualCamera::~VirtualCamera() {
    stop();
    disconnect();
}

int VirtualCamera::connect(const android::sp<ANativeWindow>& window) {
    if (window == nullptr) return android::BAD_VALUE;
    std::lock_guard<std::mutex> guard(mProduceLock);
    if (mWindow != nullptr) return android::INVALID_OPERATION;
    ANativeWindow* w = window.get();
    int status = native_window_api_connect(w, NATIVE_WINDOW_API_CAMERA);
    if (status != 0) return status;
    status = native_window_set_buffers_geometry(w, mWidth, mHeight, HAL_PIXEL_FORMAT_YCrCb_420_SP);
    if (status == 0) status = native_window_set_usage(w, GraphicBuffer::USAGE_SW_WRITE_OFTEN);
    // A frame that finds no free buffer is lost, as a camera's would be.
    if (status == 0) w->perform(w, NATIVE_WINDOW_SET_DEQUEUE_TIMEOUT, (int64_t)0);
    if (status != 0) {
        native_window_api_disconnect(w, NATIVE_WINDOW_API_CAMERA);
        return status;
    }
    mWindow = window;
    mEnded = false;
    return 0;
}

void VirtualCamera::disconnect() {
    std::lock_guard<std::mutex> guard(mProduceLock);
    if (mWindow == nullptr) return;
    native_window_api_disconnect(mWindow.get(), NATIVE_WINDOW_API_CAMERA);
    mWindow.clear();
}

int VirtualCamera::queueFrame() {
    std::lock_guard<std::mutex> guard(mProduceLock);
    int status = produce_l();
    if (status == 0) {
        ++mQueued;
    } else {
        ++mNotQueued;
        if (status == android::NO_INIT || status == android::NOT_ENOUGH_DATA) mEnded = true;
    }
    return status;
}

int VirtualCamera::produce_l() {
    ANativeWindow* w = mWindow.get();
    if (w == nullptr) return android::NO_INIT;
    ANativeWindowBuffer* native = nullptr;
    int fence = -1;
    int status = w->dequeueBuffer(w, &native, &fence);
    if (status != 0) return status;
    GraphicBuffer* buffer = GraphicBuffer::from(native);
    void* address = nullptr;
    status = buffer->lock(GraphicBuffer::USAGE_SW_WRITE_OFTEN, &address);
    if (status != 0) {
        w->cancelBuffer(w, native, -1);
        return status;
    }
    const int stride = (int)buffer->getStride();
    const size_t frameBytes = VCImage_requiredSize(mWidth, mHeight, VC_FORMAT_NV21);
    if (stride != mWidth && mScratch.size() < frameBytes) mScratch.resize(frameBytes);
    unsigned char* pixels =
        stride == mWidth ? static_cast<unsigned char*>(address) : mScratch.data();
    VCImage frame;
    frame.data = pixels;
    frame.width = mWidth;
    frame.height = mHeight;
    frame.format = VC_FORMAT_NV21;
    frame.wrapped = 1;
    frame.size = (uint32_t)frameBytes;
    frame.uvOffset = 0;
    const bool rendered = mSource->render(mNextIndex, &frame);
    frame.data = nullptr;  // never the record's to free
    if (rendered && stride != mWidth) {
        // Luma rows, then the interleaved chroma rows, each `stride` apart.
        unsigned char* out = static_cast<unsigned char*>(address);
        const unsigned char* in = pixels;
        for (int row = 0; row < mHeight + mHeight / 2; ++row) {
            memcpy(out + (size_t)row * stride, in + (size_t)row * mWidth, mWidth);
        }
    }
    buffer->unlock();
    if (!rendered) {
        w->cancelBuffer(w, native, -1);
        return android::NOT_ENOUGH_DATA;
    }
    native_window_set_buffers_timestamp(w, EglClock::get().bootTime());
    status = w->queueBuffer(w, native, -1);
    if (status == 0) ++mNextIndex;
    return status;
}

int VirtualCamera::start(double fps) {
    if (fps <= 0) return android::BAD_VALUE;
    std::lock_guard<std::mutex> guard(mLock);
    if (mThread.joinable()) return android::INVALID_OPERATION;
    mStop = false;  // a stall or burst asked for before the start holds
    mThread = std::thread(&VirtualCamera::run, this, fps);
    return 0;
}

void VirtualCamera::stall(bool stalled) {
    std::lock_guard<std::mutex> guard(mLock);
    mStalled = stalled;
    mWake.notify_all();
}

void VirtualCamera::burst(int frames) {
    std::lock_guard<std::mutex> guard(mLock);
    mBurst += frames > 0 ? frames : 0;
    mWake.notify_all();
}

void VirtualCamera::stop() {
    {
        std::lock_guard<std::mutex> guard(mLock);
        mStop = true;
        mWake.notify_all();
    }
    if (mThread.joinable()) mThread.join();
}

void VirtualCamera::run(double fps) {
    // A producer, not under test for its timing: the real clock paces it.
    using Clock = std::chrono::steady_clock;
    const auto period =
        std::chrono::duration_cast<Clock::duration>(std::chrono::duration<double>(1.0 / fps));
    auto next = Clock::now();
    BackgroundThread_enter();
    std::unique_lock<std::mutex> lock(mLock);
    while (!mStop) {
        if (mBurst > 0) {
            --mBurst;
        } else if (mStalled) {
            mWake.wait(lock);
            next = Clock::now();
            continue;
        } else if (Clock::now() < next) {
            mWake.wait_until(lock, next);
            continue;
        } else {
            next += period;
            if (next < Clock::now()) next = Clock::now();  // late: no catch-up flood
        }
        lock.unlock();
        queueFrame();
        lock.lock();
        if (mEnded) break;
    }
}

}  // namespace kivhost
