#include "kivhost/PreviewWindow.h"

#include <gui/HostWindow.h>

namespace kivhost {

PreviewWindow::PreviewWindow(int width, int height)
    : mWindow(new android::HostWindow(width > 0 ? width : 0, height > 0 ? height : 0)) {}

PreviewWindow::~PreviewWindow() = default;

android::sp<ANativeWindow> PreviewWindow::window() const {
    return mWindow.get();
}

uint64_t PreviewWindow::framesShown() {
    return mWindow->queuedTotal();
}

std::vector<uint8_t> PreviewWindow::latestFrame() {
    return mWindow->latestFrame();
}

}  // namespace kivhost
