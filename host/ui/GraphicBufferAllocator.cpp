#include "host/ui/GraphicBufferAllocator.h"

#include <string.h>

#include <ui/GraphicBuffer.h>

#include "core/egl/HalPixelFormat.h"
#include "host/graphics/HostGl.h"
#include "vccore/vc_log.h"

namespace android {

namespace {

const size_t kMaxEntries = 4;
const size_t kMaxBytes = (size_t)384 << 20;

// What a kept buffer holds: its CPU copy (or the file shared with its
// texture) and what its mirror holds beyond that.
size_t bytesOf(const BufferStorage& s) {
    return (s.file != nullptr ? s.file->fileSize() : s.size) + s.mirror->bytes();
}

}  // namespace

GraphicBufferAllocator& GraphicBufferAllocator::get() {
    // Never destroyed: buffers may go away in static destructors.
    static GraphicBufferAllocator* instance = new GraphicBufferAllocator();
    return *instance;
}

GraphicBufferAllocator::GraphicBufferAllocator() {
    HostGl::setDisplayIdleHook(&GraphicBufferAllocator::drain);
}

status_t GraphicBufferAllocator::allocate(uint32_t w, uint32_t h, PixelFormat format,
                                          uint32_t usage, uint32_t stride,
                                          std::unique_ptr<BufferStorage>* out) {
    const uint32_t fourcc = HalPixelFormat::fourccOf(format, false);
    // 4:2:0 layouts need even sizes; planar chroma rows need an even stride.
    if (fourcc == 0 || w == 0 || h == 0 || w > 16384 || h > 16384 || stride < w || stride > 16384 ||
        (VCImage_isYUV(fourcc) && ((w | h | stride) & 1) != 0)) {
        VF_LogMsg(VF_LOG_ERROR, "GraphicBuffer: cannot allocate %ux%u format %d (stride %u)", w, h,
                  format, stride);
        return BAD_VALUE;
    }
    const bool gpu = (usage & GraphicBuffer::USAGE_HW_MASK) != 0;
    const bool render = (usage & GraphicBuffer::USAGE_HW_RENDER) != 0;
    std::unique_ptr<BufferStorage> s = gpu ? take(fourcc, w, h, stride, render) : nullptr;
    if (s != nullptr) {
        // What the GPU renders into starts clean on both sides, so that
        // nothing drawn for one buffer ever shows in another. A texture-only
        // buffer keeps the bytes it gets, and its mirror with them, until the
        // CPU writes it: a new buffer's contents are undefined on a device too.
        if (render) {
            memset(s->data, 0, s->size);
            s->zero = true;
            s->mirrorCurrent = s->mirror->kind() == GpuMirror::SHARED;
        }
        *out = std::move(s);
        return NO_ERROR;
    }
    s.reset(new BufferStorage());
    s->fourcc = fourcc;
    s->width = w;
    s->height = h;
    s->stride = stride;
    s->render = render;
    s->size = VCImage_requiredSize((int)stride, (int)h, fourcc);
    // RGBA rows exactly as far apart as the driver's can be the texture's own
    // storage; fresh memory reads as zeros, as calloc's does.
    if (gpu && fourcc == VC_FORMAT_RGBA && (size_t)stride * 4 == SharedPixels::rowPitch(w) &&
        SharedPixels::mayImport()) {
        s->file.reset(new SharedPixels());
        if (s->file->allocate(w, h)) {
            s->data = s->file->pixels();
        } else {
            s->file.reset();
        }
    }
    if (s->data == nullptr) s->data = static_cast<unsigned char*>(calloc(1, s->size));
    if (s->data == nullptr) return NO_MEMORY;
    *out = std::move(s);
    return NO_ERROR;
}

std::unique_ptr<BufferStorage> GraphicBufferAllocator::take(uint32_t fourcc, uint32_t w, uint32_t h,
                                                            uint32_t stride, bool render) {
    std::lock_guard<std::mutex> guard(mLock);
    const bool imports = SharedPixels::mayImport();
    for (size_t i = mPool.size(); i-- > 0;) {
        BufferStorage& e = *mPool[i];
        if (e.fourcc == fourcc && e.width == w && e.height == h && e.stride == stride &&
            e.render == render && (imports || e.mirror->kind() == GpuMirror::TRANSFER)) {
            std::unique_ptr<BufferStorage> s = std::move(mPool[i]);
            mPool.erase(mPool.begin() + (ptrdiff_t)i);
            mBytes -= bytesOf(*s);
            return s;
        }
    }
    return nullptr;
}

void GraphicBufferAllocator::free(std::unique_ptr<BufferStorage> s) {
    // Worth keeping after GPU use only, and only with the mirror holding the
    // last unlocked state of the CPU copy. The next owner reaches imported
    // storage from the CPU: nothing may still draw from or into it then.
    if (s == nullptr || s->mirror == nullptr || s->lockUsage != 0 ||
        (s->mirror->kind() != GpuMirror::TRANSFER && !HostGl::get().waitForGpu())) {
        return;
    }
    s->gpuUsed = false;
    s->images = 0;
    s->gpuDirty = false;
    s->gpuDrawn = false;
    s->uploads = s->readbacks = 0;
    std::vector<std::unique_ptr<BufferStorage>> evicted;  // freed once the lock is let go
    {
        // Only while someone else uses the display: the host context must not
        // outlive its last user for the sake of buffers nobody may ask for
        // again. (Checked under the lock, so that an eglTerminate that drains
        // cannot slip in between.)
        std::lock_guard<std::mutex> guard(mLock);
        const size_t bytes = bytesOf(*s);
        if (bytes > kMaxBytes || !HostGl::get().displayHasOtherUsers()) {
            evicted.push_back(std::move(s));
            return;
        }
        while (!mPool.empty() && (mPool.size() >= kMaxEntries || mBytes + bytes > kMaxBytes)) {
            mBytes -= bytesOf(*mPool.front());
            evicted.push_back(std::move(mPool.front()));
            mPool.erase(mPool.begin());
        }
        mBytes += bytes;
        mPool.push_back(std::move(s));
    }
}

void GraphicBufferAllocator::drain() {
    std::vector<std::unique_ptr<BufferStorage>> all;
    {
        GraphicBufferAllocator& self = get();
        std::lock_guard<std::mutex> guard(self.mLock);
        all.swap(self.mPool);
        self.mBytes = 0;
    }
}

}  // namespace android
