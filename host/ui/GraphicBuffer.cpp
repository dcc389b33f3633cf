#include <ui/GraphicBuffer.h>

#include <string.h>

#include <algorithm>
#include <vector>

#include "core/egl/EglExtensions.h"
#include "host/graphics/HostGl.h"
#include "host/ui/GraphicBufferAllocator.h"
#include "host/ui/GraphicBufferMapper.h"
#include "vccore/vc_log.h"

namespace android {

GraphicBuffer::GraphicBuffer() : mRequestorName("<Unknown>"), mInitCheck(NO_INIT) {
    init(0, 0, 0, 0, 0);
}

GraphicBuffer::GraphicBuffer(uint32_t inWidth, uint32_t inHeight, PixelFormat inFormat,
                             uint32_t inUsage, std::string requestorName)
    : GraphicBuffer() {
    mRequestorName = std::move(requestorName);
    init(inWidth, inHeight, inFormat, inUsage, inWidth);
}

GraphicBuffer::GraphicBuffer(uint32_t inWidth, uint32_t inHeight, PixelFormat inFormat,
                             uint32_t inUsage, uint32_t inStride, std::string requestorName)
    : GraphicBuffer() {
    mRequestorName = std::move(requestorName);
    init(inWidth, inHeight, inFormat, inUsage, inStride);
}

void GraphicBuffer::init(uint32_t w, uint32_t h, PixelFormat f, uint32_t inUsage,
                         uint32_t inStride) {
    common.incRef = incRef;
    common.decRef = decRef;
    width = (int)w;
    height = (int)h;
    stride = (int)inStride;
    format = f;
    usage = inUsage;
    usage_deprecated = (int)inUsage;
    layerCount = 1;
    handle = nullptr;
    if (w == 0 && h == 0) return;  // the empty buffer
    mInitCheck = GraphicBufferAllocator::get().allocate(w, h, f, inUsage, inStride, &mStorage);
}

GraphicBuffer::~GraphicBuffer() {
    // The memory may be recycled: a draw into it must be over first.
    waitForGpuWrite();
    GraphicBufferAllocator::get().free(std::move(mStorage));
}

void GraphicBuffer::incRef(android_native_base_t* base) {
    GraphicBuffer* self = static_cast<GraphicBuffer*>(reinterpret_cast<ANativeWindowBuffer*>(base));
    self->incStrong(self);
}

void GraphicBuffer::decRef(android_native_base_t* base) {
    GraphicBuffer* self = static_cast<GraphicBuffer*>(reinterpret_cast<ANativeWindowBuffer*>(base));
    self->decStrong(self);
}

ANativeWindowBuffer* GraphicBuffer::getNativeBuffer() const {
    return const_cast<GraphicBuffer*>(this);
}

GraphicBuffer* GraphicBuffer::from(ANativeWindowBuffer* buffer) {
    return buffer == nullptr ? nullptr : static_cast<GraphicBuffer*>(buffer);
}

status_t GraphicBuffer::lock(uint32_t inUsage, void** vaddr) {
    if (vaddr == nullptr) return BAD_VALUE;
    if (mStorage == nullptr) return NO_INIT;
    return GraphicBufferMapper::lock(*mStorage, inUsage, vaddr);
}

status_t GraphicBuffer::lockYCbCr(uint32_t inUsage, android_ycbcr* ycbcr) {
    if (ycbcr == nullptr) return BAD_VALUE;
    if (mStorage == nullptr) return NO_INIT;
    return GraphicBufferMapper::lockYCbCr(*mStorage, inUsage, ycbcr);
}

status_t GraphicBuffer::unlock() {
    if (mStorage == nullptr) return INVALID_OPERATION;
    return GraphicBufferMapper::unlock(*mStorage);
}

EGLImageKHR GraphicBuffer::createEglImage(EGLDisplay display) {
    if (mStorage == nullptr) return EGL_NO_IMAGE_KHR;
    BufferStorage& s = *mStorage;
    std::lock_guard<std::mutex> guard(s.mLock);
    if (!GraphicBufferMapper::waitForWrite_l(s)) return EGL_NO_IMAGE_KHR;
    // The first GPU use makes the mirror (unless it came with recycled
    // memory) and brings it the CPU copy.
    if (s.mirror == nullptr) s.mirror = GpuMirror::make(s);
    if (s.mirror == nullptr || (!s.mirrorCurrent && !s.mirror->toGpu(s))) return EGL_NO_IMAGE_KHR;
    s.mirrorCurrent = true;
    HostGl& gl = HostGl::get();
    const EGLint attribs[] = {EGL_GL_TEXTURE_LEVEL_KHR, 0, EGL_IMAGE_PRESERVED_KHR, EGL_TRUE,
                              EGL_NONE};
    EGLImageKHR image = EGL_NO_IMAGE_KHR;
    gl.run([&] {
        if (display != gl.display()) {
            VF_LogMsg(VF_LOG_ERROR, "GraphicBuffer: EGL image asked for another display");
            return false;
        }
        image = EglExtensions::get().eglCreateImageKHR(
            gl.display(), gl.context(), EGL_GL_TEXTURE_2D_KHR,
            (EGLClientBuffer)(uintptr_t)s.mirror->texture(), attribs);
        return image != EGL_NO_IMAGE_KHR;
    });
    if (image != EGL_NO_IMAGE_KHR) {
        ++s.images;
        s.gpuUsed = true;
    }
    return image;
}

void GraphicBuffer::onEglImageDestroyed() {
    if (mStorage == nullptr) return;
    std::lock_guard<std::mutex> guard(mStorage->mLock);
    if (mStorage->images > 0) --mStorage->images;
    // What was rendered through the image is still to be read back.
    mStorage->gpuDirty = true;
}

void GraphicBuffer::setGpuWrite(EGLDisplay display, EGLSyncKHR fence) {
    if (mStorage == nullptr) return;
    BufferStorage& s = *mStorage;
    std::lock_guard<std::mutex> guard(s.mLock);
    // An earlier draw nobody waited for (its frame was dropped unread) was
    // queued before this one and is over by now: let its fence go.
    GraphicBufferMapper::waitForWrite_l(s);
    s.writeDisplay = display;
    s.writeFence = fence;
    s.gpuDrawn = true;
}

status_t GraphicBuffer::waitForGpuWrite() {
    if (mStorage == nullptr) return NO_ERROR;
    std::lock_guard<std::mutex> guard(mStorage->mLock);
    return GraphicBufferMapper::waitForWrite_l(*mStorage) ? NO_ERROR : UNKNOWN_ERROR;
}

bool GraphicBuffer::hasGpuWrite() {
    if (mStorage == nullptr) return false;
    std::lock_guard<std::mutex> guard(mStorage->mLock);
    return mStorage->writeFence != EGL_NO_SYNC_KHR;
}

status_t GraphicBuffer::writeRgbaFrame(const unsigned char* rgba, uint32_t frameWidth,
                                       uint32_t frameHeight, bool bottomUp) {
    if (rgba == nullptr) return BAD_VALUE;
    const size_t w = (size_t)width, h = (size_t)height;
    const bool covers = frameWidth >= w && frameHeight >= h;
    void* ignored = nullptr;
    // A frame that covers the buffer needs none of its old pixels.
    status_t status =
        lock(covers ? USAGE_SW_WRITE_OFTEN : USAGE_SW_READ_OFTEN | USAGE_SW_WRITE_OFTEN, &ignored);
    if (status != NO_ERROR) return status;
    const PixelRows memory = GraphicBufferMapper::rowsOf(*mStorage);
    if (covers && memory.fourcc == VC_FORMAT_RGBA) {
        // Straight into the buffer's rows: a swap pays one copy, not a
        // fresh picture and a move (every preview and recorded frame).
        for (size_t row = 0; row < h; ++row) {
            const size_t source = bottomUp ? frameHeight - 1 - row : row;
            memcpy(memory.data + row * (size_t)memory.rowPixels * 4, rgba + source * frameWidth * 4,
                   w * 4);
        }
        return unlock();
    }
    std::vector<unsigned char> full(w * h * 4), scratch[2];
    const PixelRows picture = {full.data(), VC_FORMAT_RGBA, width, height, width};
    // What the frame does not cover keeps the buffer's pixels.
    bool ok = covers || GraphicBufferMapper::move(memory, picture, scratch);
    const size_t rows = std::min<size_t>(frameHeight, h),
                 bytes = std::min<size_t>(frameWidth, w) * 4;
    for (size_t row = 0; ok && row < rows; ++row) {
        size_t source = bottomUp ? frameHeight - 1 - row : row;
        memcpy(&full[row * w * 4], rgba + source * frameWidth * 4, bytes);
    }
    if (!ok || !GraphicBufferMapper::move(picture, memory, scratch)) status = UNKNOWN_ERROR;
    status_t unlocked = unlock();
    return status != NO_ERROR ? status : unlocked;
}

}  // namespace android
