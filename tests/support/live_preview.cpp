#include "support/live_preview.h"

#include <cstring>

using android::sp;

LivePreview::LivePreview(const LivePreviewSetup& s)
    : setup(s),
      manager(new OpenGLManager(s.mode, s.display)),
      preview(new android::HostWindow(s.width, s.height)) {
    const int cameras = s.layout == CAMERA_LAYOUT_DUAL ? 2 : 1;
    for (int i = 0; i < cameras; ++i) {
        camera[i].reset(new kivhost::VirtualCamera(
            kivhost::VirtualCamera_generator(s.width, s.height), s.width, s.height));
    }
}

LivePreview::~LivePreview() {
    release();
}

bool LivePreview::start(bool firstFrame) {
    manager->setCameraSize(setup.width, setup.height, camera[1] ? setup.width : 0,
                           camera[1] ? setup.height : 0);
    manager->setPreviewWindow(setup.previewWindow ? sp<ANativeWindow>(preview.get()) : nullptr,
                              setup.layout);
    manager->startRenderThread();
    for (int i = 0; i < 2 && camera[i]; ++i) {
        sp<ANativeWindow> window = manager->getNewPreviewWindowForOpenGL(i);
        if (window == nullptr || camera[i]->connect(window) != 0) return false;
        for (int n = 0; firstFrame && n < setup.firstFrames[i]; ++n) {
            if (camera[i]->queueFrame() != 0) return false;
        }
    }
    manager->notifyGLSurfaceConnectionComplete();
    return true;
}

std::vector<uint8_t> LivePreview::latestFrame() {
    return preview->latestFrame();
}

::testing::AssertionResult LivePreview::startPaced(ManualClock& clock) {
    if (!start()) return ::testing::AssertionFailure() << "the pipeline did not start";
    if (!clock.waitForWaitsBegun(1)) return ::testing::AssertionFailure() << "never paced";
    if (framesShown() != 11u)
        return ::testing::AssertionFailure() << framesShown() << " frames before pacing, not 11";
    return ::testing::AssertionSuccess();
}

::testing::AssertionResult LivePreview::step(ManualClock& clock, int ms, bool frame) {
    const size_t waits = clock.waitsBegun();
    for (int i = 0; i < 2 && frame; ++i) {
        if (camera[i] && camera[i]->queueFrame() != 0)
            return ::testing::AssertionFailure() << "camera " << i << " frame not queued";
    }
    clock.advanceMs(ms);
    if (!clock.waitForWaitsBegun(waits + 1))
        return ::testing::AssertionFailure() << "the render thread did not come round";
    return ::testing::AssertionSuccess();
}

void LivePreview::release() {
    if (mReleased) return;
    mReleased = true;
    manager->release();
    for (auto& c : camera) {
        if (c) c->disconnect();
    }
}

std::vector<uint8_t> LivePreview_flipRows(const std::vector<uint8_t>& rgba, int width, int height) {
    std::vector<uint8_t> out(rgba.size());
    const size_t row = (size_t)width * 4;
    for (int y = 0; y < height; ++y) memcpy(&out[y * row], &rgba[(height - 1 - y) * row], row);
    return out;
}

std::vector<uint8_t> LivePreview_mirror(const std::vector<uint8_t>& rgba, int width, int height) {
    std::vector<uint8_t> out(rgba.size());
    for (int y = 0; y < height; ++y) {
        for (int x = 0; x < width; ++x) {
            memcpy(&out[((size_t)y * width + x) * 4],
                   &rgba[((size_t)y * width + width - 1 - x) * 4], 4);
        }
    }
    return out;
}

int64_t LivePreview_frameNumber(const std::vector<uint8_t>& rgba, int width, int height) {
    if (rgba.size() != (size_t)width * height * 4) return -1;
    return kivhost::VirtualCamera_decodeFrameNumber(rgba.data(), width, height, false);
}
