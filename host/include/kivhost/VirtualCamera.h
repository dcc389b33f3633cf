// A camera for a Linux host: it connects to any ANativeWindow as the camera
// API and queues NV21 frames into it, stamped with the boot clock, from a
// source: moving colour bars with the frame number drawn in (as a binary
// code that decodeFrameNumber() reads back from the pixels, and as digits),
// a list or folder of JPEG/PNG pictures, or a video file.
//
// Frames go out one at a time on the caller's thread (queueFrame(), for
// anything that needs determinism) or from a thread of its own at a set rate
// (start()), which can be stalled, made to burst and stopped. Like a camera
// whose consumer holds every buffer, it never waits for the window: a frame
// that finds no free buffer is counted as not queued.
#ifndef KIVHOST_VIRTUALCAMERA_H
#define KIVHOST_VIRTUALCAMERA_H

#include <stdint.h>

#include <atomic>
#include <condition_variable>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include <system/window.h>
#include <utils/StrongPointer.h>

#include "vccore/vc_image.h"

namespace kivhost {

class VirtualCameraSource {
public:
    virtual ~VirtualCameraSource() = default;
    // Writes frame `index` (0 for the first the camera sends) into `frame`,
    // an NV21 picture of the camera's size. False when the source has no
    // more frames or fails (logged).
    virtual bool render(uint64_t index, VCImage* frame) = 0;
};

// Colour bars moving two pixels (or 1/64 of the width) a frame, with the
// frame index as a binary code across the top and in digits below it.
std::unique_ptr<VirtualCameraSource> VirtualCamera_generator(int width, int height);
// The pictures in turn (a folder: its .jpg, .jpeg and .png files by name),
// stretched to the camera's size; null when none can be read (logged).
std::unique_ptr<VirtualCameraSource> VirtualCamera_pictures(const std::vector<std::string>& paths,
                                                            int width, int height);
std::unique_ptr<VirtualCameraSource> VirtualCamera_folder(const std::string& folder, int width,
                                                          int height);
// A video file decoded with FFmpeg and scaled to the camera's size, from its
// start again at its end when `loop`; null when it cannot be opened or the
// host video library cannot be loaded (logged).
std::unique_ptr<VirtualCameraSource> VirtualCamera_video(const std::string& path, int width,
                                                         int height, bool loop);

// Where the generator draws its code: the frame index read back from an RGBA
// picture of the generated frame (GL rows bottom-up when `bottomUp`), or -1
// when the code is not there.
int64_t VirtualCamera_decodeFrameNumber(const uint8_t* rgba, int width, int height, bool bottomUp);

class VirtualCamera {
public:
    VirtualCamera(std::unique_ptr<VirtualCameraSource> source, int width, int height);
    // Stops and disconnects.
    ~VirtualCamera();

    // Connects as the camera API and sets the window's buffers to the
    // camera's size, NV21 and software writes; the window's own status.
    int connect(const android::sp<ANativeWindow>& window);
    void disconnect();

    // One frame now, on this thread: 0 when queued, else the window's
    // status (WOULD_BLOCK with no free buffer, NO_INIT once its consumer is
    // gone) or NOT_ENOUGH_DATA when the source has no more frames.
    int queueFrame();

    // A thread queueing `fps` frames a second until stop().
    int start(double fps);
    // Holds the thread's frames back until resumed.
    void stall(bool stalled);
    // The thread sends `frames` frames at once, then keeps its rate.
    void burst(int frames);
    void stop();

    uint64_t framesQueued() const { return mQueued.load(); }
    uint64_t framesNotQueued() const { return mNotQueued.load(); }
    // The source gave no more frames, or the window's consumer went away.
    bool ended() const { return mEnded.load(); }
    int width() const { return mWidth; }
    int height() const { return mHeight; }

    VirtualCamera(const VirtualCamera&) = delete;
    VirtualCamera& operator=(const VirtualCamera&) = delete;

private:
    void run(double fps);
    int produce_l();

    const std::unique_ptr<VirtualCameraSource> mSource;
    const int mWidth;
    const int mHeight;
    std::mutex mProduceLock;  // one frame at a time, from either mode
    android::sp<ANativeWindow> mWindow;
    uint64_t mNextIndex = 0;
    std::vector<unsigned char> mScratch;  // for buffers whose rows are padded
    std::atomic<uint64_t> mQueued{0};
    std::atomic<uint64_t> mNotQueued{0};
    std::atomic<bool> mEnded{false};

    std::mutex mLock;  // the thread's commands
    std::condition_variable mWake;
    std::thread mThread;
    bool mStop = false;
    bool mStalled = false;
    int mBurst = 0;
};

}  // namespace kivhost

#endif
