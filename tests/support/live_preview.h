// A live pipeline for tests: an OpenGLManager drawing into a host window
// whose frames the test reads, fed by one or two virtual cameras (the
// generator: numbered frames) that the test drives frame by frame.
#ifndef KIV_TESTS_SUPPORT_LIVE_PREVIEW_H
#define KIV_TESTS_SUPPORT_LIVE_PREVIEW_H

#include <gui/HostWindow.h>
#include <utils/StrongPointer.h>

#include <cstdint>
#include <memory>
#include <vector>

#include "kivhost/VirtualCamera.h"
#include "kivimaging/OpenGLManager.h"

struct LivePreviewSetup {
    int width = 64;
    int height = 48;
    int layout = CAMERA_LAYOUT_SINGLE;
    OpenGLManagerMode mode = OPENGL_MANAGER_DIRECT;
    DisplayDeviceMode display = DISPLAY_DEVICE_GPU;
    bool previewWindow = true;
};

class LivePreview {
public:
    explicit LivePreview(const LivePreviewSetup& setup = LivePreviewSetup());
    // Releases the manager if the test did not.
    ~LivePreview();

    // Starts the render thread and connects the cameras; with `firstFrame`
    // each camera queues its frame 0 before the thread may draw.
    bool start(bool firstFrame = true);
    // The newest frame the preview window holds, RGBA top row first (older
    // ones are dropped); empty when none is queued.
    std::vector<uint8_t> latestFrame();
    // Frames the manager has swapped into the preview window.
    uint64_t framesShown() { return mPreview->queuedTotal(); }
    void release();

    const LivePreviewSetup setup;
    android::sp<OpenGLManager> manager;
    android::sp<android::HostWindow> preview;
    std::unique_ptr<kivhost::VirtualCamera> camera[2];

private:
    android::sp<android::HostWindow>& mPreview = preview;
    bool mReleased = false;
};

// An RGBA picture upside down (rows swapped).
std::vector<uint8_t> LivePreview_flipRows(const std::vector<uint8_t>& rgba, int width, int height);
// An RGBA picture mirrored left to right.
std::vector<uint8_t> LivePreview_mirror(const std::vector<uint8_t>& rgba, int width, int height);

#endif
