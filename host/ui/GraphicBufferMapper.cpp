#include "host/ui/GraphicBufferMapper.h"

#include <string.h>

#include <ui/GraphicBuffer.h>

#include "core/egl/EglExtensions.h"
#include "host/graphics/HostGl.h"
#include "vc_image_layout.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_geometry.h"
#include "vccore/vc_log.h"

namespace android {

unsigned char* GraphicBufferMapper::scratch(std::vector<unsigned char>& memory, int width,
                                            int height, uint32_t fourcc) {
    size_t bytes = VCImage_requiredSize(width, height, fourcc);
    if (memory.size() < bytes) memory.resize(bytes);
    return memory.data();
}

bool GraphicBufferMapper::move(const PixelRows& from, const PixelRows& to,
                               std::vector<unsigned char>* memory) {
    const int w = from.width, h = from.height;
    PixelView source(from.data, from.rowPixels, h, from.fourcc);
    if (from.rowPixels != w) {
        const bool direct = to.rowPixels == w && to.fourcc == from.fourcc;
        PixelView compact(direct ? to.data : scratch(memory[0], w, h, from.fourcc), w, h,
                          from.fourcc);
        if (VCImage_crop(&source, &compact, 0, 0) != 0) return false;
        if (direct) return true;
        source.data = compact.data;
        source.width = w;
    }
    if (to.rowPixels != w && from.fourcc != to.fourcc) {
        PixelView converted(scratch(memory[1], w, h, to.fourcc), w, h, to.fourcc);
        if (VCImage_convert(&source, &converted) != 0) return false;
        source.data = converted.data;
        source.format = to.fourcc;
    }
    PixelView target(to.data, to.rowPixels, h, to.fourcc);
    if (to.rowPixels == w) return VCImage_convert(&source, &target) == 0;
    return VCImage_drawImage(&source, &target, 0, 0) == 0;
}

bool GraphicBufferMapper::waitForWrite_l(BufferStorage& s) {
    if (s.writeFence == EGL_NO_SYNC_KHR) return true;
    const EglExtensions& ext = EglExtensions::get();
    const bool done = ext.eglClientWaitSyncKHR(s.writeDisplay, s.writeFence, 0, EGL_FOREVER_KHR) ==
                      EGL_CONDITION_SATISFIED_KHR;
    if (!done) {
        // Nothing else tells when the draw ends: wait for all GPU work.
        VF_LogMsg(VF_LOG_ERROR, "GraphicBuffer: cannot wait for the draw's fence (0x%04x)",
                  eglGetError());
        if (!HostGl::get().waitForGpu()) return false;
    }
    ext.eglDestroySyncKHR(s.writeDisplay, s.writeFence);
    s.writeFence = EGL_NO_SYNC_KHR;
    s.writeDisplay = EGL_NO_DISPLAY;
    return true;
}

status_t GraphicBufferMapper::lock_l(BufferStorage& s, uint32_t usage) {
    if ((usage & GraphicBuffer::USAGE_SOFTWARE_MASK) == 0) return BAD_VALUE;
    if (s.lockUsage != 0) return INVALID_OPERATION;
    if (!waitForWrite_l(s)) return UNKNOWN_ERROR;
    const bool cpuWrites = (usage & GraphicBuffer::USAGE_SW_WRITE_MASK) != 0;
    const bool shared = s.mirror != nullptr && s.mirror->kind() == GpuMirror::SHARED;
    if (s.gpuWrote()) {
        if (!s.mirror->toCpu(s)) return UNKNOWN_ERROR;
        s.gpuDirty = false;
        s.gpuDrawn = false;
        s.zero = false;
        if (!shared) {
            ++s.readbacks;
            // Kept to spot an unchanged copy at unlock: sending it back up
            // would cost a transfer, and for YUV would replace the rendered
            // RGBA with a converted round trip of it.
            if (cpuWrites) s.readbackCopy.assign(s.data, s.data + s.size);
        }
    } else if (shared && cpuWrites && s.images > 0 && !HostGl::get().waitForGpu()) {
        return UNKNOWN_ERROR;  // one storage: the GPU must be done sampling it first
    }
    s.lockUsage = usage;
    return NO_ERROR;
}

status_t GraphicBufferMapper::lock(BufferStorage& s, uint32_t usage, void** vaddr) {
    std::lock_guard<std::mutex> guard(s.mLock);
    status_t status = lock_l(s, usage);
    *vaddr = status == NO_ERROR ? s.data : nullptr;
    return status;
}

status_t GraphicBufferMapper::lockYCbCr(BufferStorage& s, uint32_t usage, android_ycbcr* ycbcr) {
    std::lock_guard<std::mutex> guard(s.mLock);
    const PixelView picture(s.data, (int)s.stride, (int)s.height, s.fourcc);
    VCYuvLayout layout;
    if (!VCImage_isYUV420(s.fourcc) || !VCImage_yuvLayout(&picture, &layout)) return BAD_VALUE;
    status_t status = lock_l(s, usage);
    if (status != NO_ERROR) return status;
    memset(ycbcr, 0, sizeof(*ycbcr));
    ycbcr->y = s.data;
    ycbcr->cb = s.data + layout.uOffset;
    ycbcr->cr = s.data + layout.vOffset;
    ycbcr->ystride = s.stride;
    // Interleaved chroma rows are as wide as luma rows; planar ones half.
    ycbcr->cstride = layout.chromaStep == 2 ? s.stride : s.stride / 2;
    ycbcr->chroma_step = layout.chromaStep;
    return NO_ERROR;
}

status_t GraphicBufferMapper::unlock(BufferStorage& s) {
    std::lock_guard<std::mutex> guard(s.mLock);
    if (s.lockUsage == 0) return INVALID_OPERATION;
    bool wrote = (s.lockUsage & GraphicBuffer::USAGE_SW_WRITE_MASK) != 0;
    s.lockUsage = 0;
    if (wrote && !s.readbackCopy.empty() &&
        memcmp(s.readbackCopy.data(), s.data, s.readbackCopy.size()) == 0) {
        wrote = false;  // the mirror already holds exactly this
    }
    s.readbackCopy.clear();
    if (!wrote) return NO_ERROR;
    s.zero = false;
    s.mirrorCurrent = s.mirror != nullptr && s.mirror->kind() == GpuMirror::SHARED;
    // CPU writes reach the GPU before its next use.
    if (s.gpuUsed && !s.mirrorCurrent) {
        if (!s.mirror->toGpu(s)) return UNKNOWN_ERROR;
        ++s.uploads;
        s.mirrorCurrent = true;
    }
    return NO_ERROR;
}

}  // namespace android
