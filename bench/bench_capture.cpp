// A 4000x3000 NV21 picture through Sepia to an NV21 listener with EglSnapShot,
// synchronously and asynchronously, against the floor of the same work done
// bare in the same run: the image core's NV21->RGBA, glTexSubImage2D into a
// texture that an external texture shares, one draw of the same program and
// effect into a framebuffer, glReadPixels, RGBA->NV21.
//
// Sides alternate run by run (rounds of one run a side, in a rotating order)
// so that load from elsewhere on the machine falls on all of them. Printed:
// sync / floor (medians over the rounds of the per-round ratio, with the
// range), and how long the asynchronous capture holds the calling (render)
// thread against the synchronous capture's whole time.
#include <EGL/egl.h>
#include <EGL/eglext.h>
#include <GLES2/gl2.h>
#include <GLES2/gl2ext.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include <algorithm>
#include <chrono>
#include <condition_variable>
#include <functional>
#include <mutex>
#include <random>
#include <vector>

#include "bench_common.h"
#include "core/egl/AsyncImageConverter.h"
#include "core/egl/EglEnvironment.h"
#include "core/egl/EglExtensions.h"
#include "core/egl/EglProgram.h"
#include "core/egl/EglSnapShot.h"
#include "core/egl/EglWindowSurface.h"
#include "core/filters/sce/fixedLooks.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_log.h"

namespace {

using namespace kivbench;

const int kWidth = 4000, kHeight = 3000, kRounds = 7;
using Clock = std::chrono::steady_clock;

class Listener : public OnFrameListener {
public:
    void onFrameProcessed(const VCImage& image, long long) override {
        std::lock_guard<std::mutex> g(mLock);
        mOk = mOk && image.format == VC_FORMAT_NV21 && image.width == kWidth;
        ++mFrames;
        mChanged.notify_all();
    }
    void onProcessingError(int, const char*) override {
        std::lock_guard<std::mutex> g(mLock);
        mOk = false;
        ++mFrames;
        mChanged.notify_all();
    }
    void waitFor(long frames) {
        std::unique_lock<std::mutex> g(mLock);
        mChanged.wait(g, [&] { return mFrames >= frames; });
    }
    bool ok() {
        std::lock_guard<std::mutex> g(mLock);
        return mOk;
    }

private:
    std::mutex mLock;
    std::condition_variable mChanged;
    long mFrames = 0;
    bool mOk = true;
};

// The floor's GL objects: a 2D texture shared with an external one, and a
// picture-sized framebuffer.
struct Floor {
    bool open(EGLDisplay display) {
        const EglExtensions& ext = EglExtensions::get();
        glGenTextures(1, &storage);
        glBindTexture(GL_TEXTURE_2D, storage);
        glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MIN_FILTER, GL_LINEAR);
        glTexImage2D(GL_TEXTURE_2D, 0, GL_RGBA, kWidth, kHeight, 0, GL_RGBA, GL_UNSIGNED_BYTE,
                     nullptr);
        image = ext.eglCreateImageKHR(display, eglGetCurrentContext(), EGL_GL_TEXTURE_2D_KHR,
                                      (EGLClientBuffer)(uintptr_t)storage, nullptr);
        glGenTextures(1, &external);
        glBindTexture(GL_TEXTURE_EXTERNAL_OES, external);
        glTexParameteri(GL_TEXTURE_EXTERNAL_OES, GL_TEXTURE_MIN_FILTER, GL_LINEAR);
        glTexParameteri(GL_TEXTURE_EXTERNAL_OES, GL_TEXTURE_MAG_FILTER, GL_LINEAR);
        ext.glEGLImageTargetTexture2DOES(GL_TEXTURE_EXTERNAL_OES, image);
        glGenTextures(1, &target);
        glBindTexture(GL_TEXTURE_2D, target);
        glTexImage2D(GL_TEXTURE_2D, 0, GL_RGBA, kWidth, kHeight, 0, GL_RGBA, GL_UNSIGNED_BYTE,
                     nullptr);
        glGenFramebuffers(1, &framebuffer);
        glBindFramebuffer(GL_FRAMEBUFFER, framebuffer);
        glFramebufferTexture2D(GL_FRAMEBUFFER, GL_COLOR_ATTACHMENT0, GL_TEXTURE_2D, target, 0);
        const bool ok = glCheckFramebufferStatus(GL_FRAMEBUFFER) == GL_FRAMEBUFFER_COMPLETE;
        glBindFramebuffer(GL_FRAMEBUFFER, 0);
        return ok && image != EGL_NO_IMAGE_KHR;
    }
    void close(EGLDisplay display) {
        glDeleteFramebuffers(1, &framebuffer);
        glDeleteTextures(1, &target);
        glDeleteTextures(1, &external);
        EglExtensions::get().eglDestroyImageKHR(display, image);
        glDeleteTextures(1, &storage);
    }
    GLuint storage = 0, external = 0, target = 0, framebuffer = 0;
    EGLImageKHR image = EGL_NO_IMAGE_KHR;
};

}  // namespace

int main() {
    quietHeadless();
    android::sp<EglEnvironment> env = new EglEnvironment();
    android::sp<EglWindowSurface> surface = new EglWindowSurface(env);
    if (env->initialize() != 0 || surface->initialize() != 0 || surface->bindSurface() != 0) {
        fprintf(stderr, "bench_capture: no EGL context (EGL_PLATFORM=surfaceless)\n");
        return 1;
    }
    const EGLDisplay display = env->getEGLDisplay();

    VCImage* picture = VCImage_createNew(kWidth, kHeight, VC_FORMAT_NV21);
    std::mt19937 rng(1);
    for (uint32_t i = 0; i < picture->size; ++i) picture->data[i] = static_cast<uint8_t>(rng());
    VCImage* rgba = VCImage_createNew(kWidth, kHeight, VC_FORMAT_RGBA);
    VCImage* out = VCImage_createNew(kWidth, kHeight, VC_FORMAT_NV21);

    Sepia sepia;
    android::sp<EglProgram> program = new EglProgram();
    program->setCameraGeometryType(EglProgram::GEOMETRY_NORMAL, 0);
    program->setFilter(&sepia);
    Floor floor;
    if (program->initialize(10, false) != 0 || !floor.open(display)) {
        fprintf(stderr, "bench_capture: GL set-up failed\n");
        return 1;
    }
    android::sp<ImageConverter> syncConverter = new SyncImageConverter;
    android::sp<ImageConverter> asyncConverter = new AsyncImageConverter(1);
    android::sp<EglSnapShot> syncShot = new EglSnapShot(env, kWidth, kHeight, syncConverter);
    android::sp<EglSnapShot> asyncShot = new EglSnapShot(env, kWidth, kHeight, asyncConverter);
    Listener listener;
    long posted = 0;
    bool ok = syncShot->initialize() == 0 && asyncShot->initialize() == 0;

    auto floorRun = [&] {
        const Clock::time_point t0 = Clock::now();
        ok = ok && VCImage_convert(picture, rgba) == 0;
        glActiveTexture(GL_TEXTURE0);
        glBindTexture(GL_TEXTURE_2D, floor.storage);
        glTexSubImage2D(GL_TEXTURE_2D, 0, 0, 0, kWidth, kHeight, GL_RGBA, GL_UNSIGNED_BYTE,
                        rgba->data);
        glBindTexture(GL_TEXTURE_EXTERNAL_OES, floor.external);
        glBindFramebuffer(GL_FRAMEBUFFER, floor.framebuffer);
        program->setCameraGeometry(kWidth, kHeight, 0, 0);
        program->setPreviewGeometry(kWidth, kHeight, false);
        ok = ok && program->onDrawFrame() == 0;
        glReadPixels(0, 0, kWidth, kHeight, GL_RGBA, GL_UNSIGNED_BYTE, rgba->data);
        glBindFramebuffer(GL_FRAMEBUFFER, 0);
        ok = ok && glGetError() == GL_NO_ERROR && VCImage_convert(rgba, out) == 0;
        return seconds(t0, Clock::now());
    };
    auto syncRun = [&] {
        const Clock::time_point t0 = Clock::now();
        ok = ok && syncShot->takePictureSync(picture, nullptr, program, listener, posted) == 0;
        listener.waitFor(++posted);
        return seconds(t0, Clock::now());
    };
    std::vector<double> held;
    auto asyncRun = [&] {
        const Clock::time_point t0 = Clock::now();
        ok = ok && asyncShot->takePictureAsync(picture, nullptr, program, listener, posted,
                                               5000000000ULL) == 0;
        const Clock::time_point t1 = Clock::now();
        listener.waitFor(++posted);
        held.push_back(seconds(t0, t1));
        return seconds(t0, Clock::now());
    };

    std::vector<std::function<double()>> sides = {floorRun, syncRun, asyncRun};
    std::vector<std::vector<double>> times(sides.size());
    for (auto& side : sides) side();  // first runs make buffers and programs
    held.clear();
    for (int round = 0; round < kRounds; ++round)
        for (size_t k = 0; k < sides.size(); ++k) {
            const size_t side = (round + k) % sides.size();
            times[side].push_back(sides[side]());
        }
    std::vector<double> syncRatio, heldRatio;
    for (int r = 0; r < kRounds; ++r) {
        syncRatio.push_back(times[1][r] / times[0][r]);
        heldRatio.push_back(held[r] / times[1][r]);
    }
    auto range = [](const std::vector<double>& v) {
        return std::make_pair(*std::min_element(v.begin(), v.end()),
                              *std::max_element(v.begin(), v.end()));
    };
    printf("NV21 4000x3000 through Sepia to an NV21 listener, %d rounds (medians, ranges)\n",
           kRounds);
    printf(
        "  floor %.1f ms, sync %.1f ms, async end to end %.1f ms, async holds the caller %.1f "
        "ms\n",
        median(times[0]) * 1e3, median(times[1]) * 1e3, median(times[2]) * 1e3, median(held) * 1e3);
    printf("ratio capture sync/floor = %.2f (range %.2f-%.2f; target <= 1.2)\n", median(syncRatio),
           range(syncRatio).first, range(syncRatio).second);
    printf("ratio capture async-held/sync = %.2f (range %.2f-%.2f; target <= 0.2)\n",
           median(heldRatio), range(heldRatio).first, range(heldRatio).second);

    syncShot->release();
    asyncShot->release();
    asyncConverter.clear();
    ok = ok && listener.ok();
    floor.close(display);
    program->release();
    VCImage_destroy(picture);
    VCImage_destroy(rgba);
    VCImage_destroy(out);
    surface->unbindSurface();
    surface->release();
    env->release();
    if (!ok) {
        fprintf(stderr, "bench_capture: a capture failed\n");
        return 1;
    }
    return 0;
}
