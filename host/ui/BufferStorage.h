// What a host GraphicBuffer stands on: memory from the allocator, the state
// of its CPU lock and the GPU mirror that goes with it. The allocator makes
// or recycles it, the mapper locks it, the mirror keeps the GPU side.
#ifndef KIV_HOST_UI_BUFFERSTORAGE_H
#define KIV_HOST_UI_BUFFERSTORAGE_H

#include <stdint.h>
#include <stdlib.h>

#include <memory>
#include <mutex>
#include <vector>

#include <EGL/egl.h>
#include <EGL/eglext.h>

#include "host/graphics/SharedPixels.h"
#include "host/ui/GpuMirror.h"
#include "vccore/vc_image.h"

namespace android {

struct BufferStorage {
    // The layout: an image-core picture `stride` pixels wide, of which each
    // row's first `width` pixels are the buffer's.
    uint32_t fourcc = 0;
    uint32_t width = 0;
    uint32_t height = 0;
    uint32_t stride = 0;
    bool render = false;  // allocated for USAGE_HW_RENDER
    unsigned char* data = nullptr;
    size_t size = 0;
    // The memory file data lives in, when the GPU may take it as storage.
    std::unique_ptr<SharedPixels> file;
    // Made at the first GPU use; recycled with the memory.
    std::unique_ptr<GpuMirror> mirror;
    // The mirror holds what data holds.
    bool mirrorCurrent = false;
    // data reads as zeros: nothing was written or read back into it.
    bool zero = true;

    // The rest is per buffer (reset when the memory is recycled), under mLock.
    std::mutex mLock;
    uint32_t lockUsage = 0;  // 0 when not locked
    bool gpuUsed = false;    // an EGL image was made over the mirror
    int images = 0;          // EGL images alive over the mirror
    bool gpuDirty = false;   // rendered through an image that is gone, not read back yet
    bool gpuDrawn = false;   // a window surface's swap drew into it, not read back yet
    // That swap's draw, while it may still be in flight: an EGL fence that
    // signals once the pixels are there (EGL_NO_SYNC_KHR when none).
    EGLDisplay writeDisplay = EGL_NO_DISPLAY;
    EGLSyncKHR writeFence = EGL_NO_SYNC_KHR;
    // The CPU copy as the last read-back left it, while that lock is held:
    // an unlock that finds it unchanged has nothing to send back up.
    std::vector<unsigned char> readbackCopy;
    uint32_t uploads = 0;
    uint32_t readbacks = 0;

    // Whether GPU rendering may be waiting to reach the CPU copy.
    bool gpuWrote() const { return gpuDrawn || (render && gpuUsed && (images > 0 || gpuDirty)); }

    ~BufferStorage() {
        mirror.reset();
        if (file == nullptr) ::free(data);
    }
};

}  // namespace android

#endif
