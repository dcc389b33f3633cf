// A Linux host has no display: this window stands in for the one a camera
// application shows its preview in. OpenGLManager draws into window(); the
// program reads back what was shown. The host's buffer queues stay behind it,
// so that a client of the installed library needs no more than this header,
// VirtualCamera.h and the platform's <system/window.h>.
#ifndef KIVHOST_PREVIEWWINDOW_H
#define KIVHOST_PREVIEWWINDOW_H

#include <stdint.h>

#include <vector>

#include <system/window.h>
#include <utils/StrongPointer.h>

namespace android {
class HostWindow;
}

namespace kivhost {

class PreviewWindow {
public:
    // RGBA buffers of this size.
    PreviewWindow(int width, int height);
    ~PreviewWindow();

    // What OpenGLManager::setPreviewWindow() takes.
    android::sp<ANativeWindow> window() const;
    // Frames queued into the window since it was made.
    uint64_t framesShown();
    // The newest frame shown, RGBA rows top first; older ones are dropped.
    // Empty when none is waiting.
    std::vector<uint8_t> latestFrame();

    PreviewWindow(const PreviewWindow&) = delete;
    PreviewWindow& operator=(const PreviewWindow&) = delete;

private:
    const android::sp<android::HostWindow> mWindow;
};

}  // namespace kivhost

#endif
