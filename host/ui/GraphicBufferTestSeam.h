// What tests of host buffers see beyond a device's interface: how often the
// CPU copy and the GPU mirror crossed, which strategy the mirror took, and a
// switch to keep new buffers off imported memory (as on a driver without it).
#ifndef KIV_HOST_UI_GRAPHICBUFFERTESTSEAM_H
#define KIV_HOST_UI_GRAPHICBUFFERTESTSEAM_H

#include <ui/GraphicBuffer.h>

#include "host/graphics/SharedPixels.h"
#include "host/ui/BufferStorage.h"

namespace android {

class GraphicBufferTestSeam {
public:
    // Crossings at unlock (uploads) and at lock (read-backs); crossings a
    // shared storage saves are not counted.
    static uint32_t uploads(const sp<GraphicBuffer>& b) { return read(b, &BufferStorage::uploads); }
    static uint32_t readbacks(const sp<GraphicBuffer>& b) {
        return read(b, &BufferStorage::readbacks);
    }
    // The CPU pixels are the GPU's storage itself (no crossings).
    static bool sharesGpuStorage(const sp<GraphicBuffer>& b) {
        BufferStorage* s = b->mStorage.get();
        if (s == nullptr) return false;
        std::lock_guard<std::mutex> guard(s->mLock);
        return s->gpuUsed && s->mirror->kind() == GpuMirror::SHARED;
    }
    // While false, buffers made (or recycled) from then on keep their GPU
    // storage to the driver and cross with GL calls.
    static void allowSharedStorage(bool allowed) { SharedPixels::allowImports(allowed); }

private:
    static uint32_t read(const sp<GraphicBuffer>& b, uint32_t BufferStorage::*counter) {
        BufferStorage* s = b->mStorage.get();
        if (s == nullptr) return 0;
        std::lock_guard<std::mutex> guard(s->mLock);
        return s->*counter;
    }
};

}  // namespace android

#endif
