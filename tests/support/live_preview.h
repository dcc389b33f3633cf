// A live pipeline for tests: an OpenGLManager drawing into a host window
// whose frames the test reads, fed by one or two virtual cameras (the
// generator: numbered frames) that the test drives frame by frame.
#ifndef KIV_TESTS_SUPPORT_LIVE_PREVIEW_H
#define KIV_TESTS_SUPPORT_LIVE_PREVIEW_H

#include <gtest/gtest.h>
#include <gui/HostWindow.h>
#include <utils/StrongPointer.h>

#include <cstdint>
#include <memory>
#include <vector>

#include "kivhost/VirtualCamera.h"
#include "core/KivImaging.h"
#include "kivimaging/OpenGLManager.h"
#include "support/manual_clock.h"

struct LivePreviewSetup {
    int width = 64;
    int height = 48;
    int layout = CAMERA_LAYOUT_SINGLE;
    OpenGLManagerMode mode = OPENGL_MANAGER_DIRECT;
    DisplayDeviceMode display = DISPLAY_DEVICE_GPU;
    bool previewWindow = true;
    // Frames each camera queues before the render thread may draw.
    int firstFrames[2] = {1, 1};
};

class LivePreview {
public:
    explicit LivePreview(const LivePreviewSetup& setup = LivePreviewSetup());
    // Releases the manager if the test did not.
    ~LivePreview();

    // Starts the render thread and connects the cameras; with `firstFrame`
    // each camera queues its first frames before the thread may draw.
    bool start(bool firstFrame = true);
    // The newest frame the preview window holds, RGBA top row first (older
    // ones are dropped); empty when none is queued.
    std::vector<uint8_t> latestFrame();
    // Frames the manager has swapped into the preview window.
    uint64_t framesShown() { return mPreview->queuedTotal(); }
    void release();

    // On a manual clock (installed before start): starts and waits until
    // the render thread paces for the first time, after the initialising
    // frame and ten unpaced ones, each shown.
    ::testing::AssertionResult startPaced(ManualClock& clock);
    // One frame period: the cameras queue a frame (unless not), the clock
    // moves `ms`, and the render thread goes round its loop once more.
    ::testing::AssertionResult step(ManualClock& clock, int ms = 41, bool frame = true);

    const LivePreviewSetup setup;
    android::sp<OpenGLManager> manager;
    android::sp<android::HostWindow> preview;
    std::unique_ptr<kivhost::VirtualCamera> camera[2];

private:
    android::sp<android::HostWindow>& mPreview = preview;
    bool mReleased = false;
};

// An effect made by id through the C API, destroyed with the handle; its
// KivImaging is what setFilter() takes.
struct LivePreviewEffect {
    explicit LivePreviewEffect(int id) : imaging(KivImaging_create(id, nullptr)) {}
    ~LivePreviewEffect() { KivImaging_destroy(imaging.getFilter()); }
    KivImaging imaging;
};

// The generator's frame number in a shown RGBA frame (top row first; the
// setup's default size unless given); -1 when there is none.
int64_t LivePreview_frameNumber(const std::vector<uint8_t>& rgba, int width = 64, int height = 48);

// An RGBA picture upside down (rows swapped).
std::vector<uint8_t> LivePreview_flipRows(const std::vector<uint8_t>& rgba, int width, int height);
// An RGBA picture mirrored left to right.
std::vector<uint8_t> LivePreview_mirror(const std::vector<uint8_t>& rgba, int width, int height);

#endif
