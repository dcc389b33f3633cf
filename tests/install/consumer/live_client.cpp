// A C++ client of the installed live render manager on a host: a manager
// that never starts is configured and released, then one draws the Negative
// effect over a virtual camera into a host preview window and hands a
// screenshot to the client's own OnFrameListener. Shown frame and screenshot
// are checked against the camera frame inverted on the CPU.
#include <stdio.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <mutex>
#include <vector>

#include <kivhost/PreviewWindow.h>
#include <kivhost/VirtualCamera.h>
#include <kivimaging/KivImaging.h>
#include <kivimaging/OpenGLManager.h>
#include <kivimaging/vccore/vccore.h>

namespace {

const int kW = 32, kH = 24;
const int kNegative = 403;

int check(bool ok, const char* what) {
    if (!ok) fprintf(stderr, "live client: %s\n", what);
    return ok ? 0 : 1;
}

// Waits for `done` a bounded time: the render thread runs on its own clock.
template <typename F>
bool waitFor(F done) {
    const auto end = std::chrono::steady_clock::now() + std::chrono::seconds(60);
    while (!done()) {
        if (std::chrono::steady_clock::now() > end) return false;
        usleep(2000);
    }
    return true;
}

class Screenshots : public OnFrameListener {
public:
    void onFrameProcessed(const VCImage& image, long long) override {
        std::lock_guard<std::mutex> guard(mLock);
        width = image.width;
        height = image.height;
        format = image.format;
        const uint8_t* data = image.data;
        rgba.assign(data, data + (size_t)image.width * image.height * 4);
        mGot.notify_all();
    }
    uint32_t getPreferredFormat() override { return VC_FORMAT_RGBA; }

    bool wait() {
        std::unique_lock<std::mutex> lock(mLock);
        return mGot.wait_for(lock, std::chrono::seconds(60), [this] { return !rgba.empty(); });
    }

    int width = 0, height = 0;
    uint32_t format = 0;
    std::vector<uint8_t> rgba;

private:
    std::mutex mLock;
    std::condition_variable mGot;
};

// The camera's frame `index` with its colours inverted, as Negative draws it.
std::vector<uint8_t> negativeOf(uint64_t index) {
    std::vector<uint8_t> nv21((size_t)kW * kH * 3 / 2), rgba((size_t)kW * kH * 4);
    VCImage* in = VCImage_createWrap(nv21.data(), kW, kH, VC_FORMAT_NV21, (int)nv21.size(), 0);
    VCImage* out = VCImage_createWrap(rgba.data(), kW, kH, VC_FORMAT_RGBA, (int)rgba.size(), 0);
    if (!kivhost::VirtualCamera_generator(kW, kH)->render(index, in) ||
        VCImage_convert(in, out) != 0) {
        rgba.clear();
    }
    VCImage_destroy(in);
    VCImage_destroy(out);
    for (size_t i = 0; i < rgba.size(); ++i) rgba[i] = i % 4 == 3 ? 255 : 255 - rgba[i];
    return rgba;
}

// `what` is Negative over one of the camera's frames (told apart by the code
// the generator draws into each), to within one level.
int checkNegative(const std::vector<uint8_t>& what, const char* label) {
    if (what.size() != (size_t)kW * kH * 4) return check(false, label);
    std::vector<uint8_t> undone(what);
    for (size_t i = 0; i < undone.size(); ++i) undone[i] = i % 4 == 3 ? 255 : 255 - undone[i];
    const int64_t index = kivhost::VirtualCamera_decodeFrameNumber(undone.data(), kW, kH, false);
    if (index < 0) return check(false, label);
    const std::vector<uint8_t> want = negativeOf(index);
    int worst = want.empty() ? 256 : 0;
    for (size_t i = 0; i < want.size(); ++i) {
        const int d = what[i] > want[i] ? what[i] - want[i] : want[i] - what[i];
        if (d > worst) worst = d;
    }
    if (worst > 1) fprintf(stderr, "live client: %s is %d levels off\n", label, worst);
    return worst > 1;
}

int neverStarted(KivImaging* effect, OnFrameListener* listener) {
    android::sp<OpenGLManager> manager =
        new OpenGLManager(OPENGL_MANAGER_INTERMEDIATE, DISPLAY_DEVICE_SOFTWARE);
    manager->setCameraSize(kW, kH, 0, 0);
    manager->setPreviewSize(kW, kH);
    manager->setFilter(effect);
    manager->setOnPictureListener(listener);
    int bad = check(manager->getNewPreviewWindowForOpenGL(2) == nullptr, "window for camera 2");
    VCImage* picture = VCImage_createNew(kW, kH, VC_FORMAT_RGBA);
    bad |= check(manager->applyToPicture(picture, nullptr) == VC_ERROR_INVALID_STATE,
                 "a picture taken without a render thread");
    VCImage_destroy(picture);  // refused, so still ours
    manager->release();
    return bad;
}

}  // namespace

int main() {
    KivImaging negative(KivImaging_create(kNegative, nullptr));
    Screenshots screenshots;
    int bad = check(negative.getFilter() != nullptr, "no Negative effect");
    if (bad) return 1;
    bad |= neverStarted(&negative, &screenshots);

    kivhost::PreviewWindow preview(kW, kH);
    kivhost::VirtualCamera camera(kivhost::VirtualCamera_generator(kW, kH), kW, kH);
    android::sp<OpenGLManager> manager =
        new OpenGLManager(OPENGL_MANAGER_DIRECT, DISPLAY_DEVICE_GPU);
    manager->setCameraSize(kW, kH, 0, 0);
    manager->setPreviewWindow(preview.window(), CAMERA_LAYOUT_SINGLE);
    manager->setFilter(&negative);
    manager->setOnPictureListener(&screenshots);
    manager->startRenderThread();
    android::sp<ANativeWindow> window = manager->getNewPreviewWindowForOpenGL(0);
    bad |= check(window != nullptr && camera.connect(window) == 0, "camera not connected");
    bad |= check(camera.queueFrame() == 0, "first camera frame");
    manager->notifyGLSurfaceConnectionComplete();
    if (!bad) {
        bad |= check(waitFor([&] { return preview.framesShown() >= 1; }), "nothing shown");
        bad |= checkNegative(preview.latestFrame(), "the shown frame");
        manager->onTakePicture(CAPTURE_SCREENSHOT);
        camera.queueFrame();  // the screenshot is served after the next frame
        bad |= check(screenshots.wait(), "no screenshot");
        bad |= check(screenshots.width == kW && screenshots.height == kH &&
                         screenshots.format == VC_FORMAT_RGBA,
                     "screenshot size or format");
        bad |= checkNegative(screenshots.rgba, "the screenshot");
    }
    manager->release();
    camera.disconnect();
    const uint64_t shown = preview.framesShown();
    manager.clear();
    KivImaging_destroy(negative.getFilter());
    if (!bad)
        printf("live client: %llu frames shown, screenshot checked\n", (unsigned long long)shown);
    return bad;
}
