// android::GraphicBuffer on a Linux host: the subset the library uses.
//
// As on a device, the buffer is a thin record over three parts (host/ui/):
//  - GraphicBufferAllocator: the memory (plain, or a memory file the GPU can
//    take as is), and a pool that recycles the memory and GPU mirror of a few
//    buffers that went away after GPU use;
//  - GraphicBufferMapper: CPU locks, their rules and plane layout, and the
//    two points where the CPU pixels and the GPU mirror meet;
//  - GpuMirror: the GPU side, an RGBA texture of the host graphics context
//    that EGL images are made from, in step with the CPU pixels by one of
//    three strategies chosen once per buffer.
// CPU writes reach the GPU before its next use (YUV converted to RGBA with
// the image core's full-range equations); GPU rendering into a buffer
// allocated with USAGE_HW_RENDER reaches the CPU at its next lock, from any
// thread. Texture-only buffers never read back: their CPU copy is the
// original, and a YUV->RGBA->YUV round trip would lose precision.
//
// A recycled render target reads as zeros on both sides, as a new buffer
// does; a recycled texture-only buffer holds the bytes it came with (its
// mirror matching them) until the CPU writes it, as contents of a new buffer
// are undefined on a device. What is kept is let go when the last other user
// of the display terminates it.
#ifndef KIV_HOST_UI_GRAPHICBUFFER_H
#define KIV_HOST_UI_GRAPHICBUFFER_H

#include <stdint.h>

#include <memory>
#include <string>

#include <EGL/egl.h>
#include <EGL/eglext.h>
#include <nativebase/nativebase.h>
#include <system/graphics.h>
#include <ui/PixelFormat.h>
#include <utils/Errors.h>
#include <utils/RefBase.h>

namespace android {

struct BufferStorage;

class GraphicBuffer : public ANativeWindowBuffer, public RefBase {
public:
    enum {
        USAGE_SW_READ_NEVER = 0x0,
        USAGE_SW_READ_RARELY = 0x2,
        USAGE_SW_READ_OFTEN = 0x3,
        USAGE_SW_READ_MASK = 0xF,

        USAGE_SW_WRITE_NEVER = 0x00,
        USAGE_SW_WRITE_RARELY = 0x20,
        USAGE_SW_WRITE_OFTEN = 0x30,
        USAGE_SW_WRITE_MASK = 0xF0,

        USAGE_SOFTWARE_MASK = USAGE_SW_READ_MASK | USAGE_SW_WRITE_MASK,

        USAGE_PROTECTED = 0x4000,

        USAGE_HW_TEXTURE = 0x100,
        USAGE_HW_RENDER = 0x200,
        USAGE_HW_2D = 0x400,
        USAGE_HW_COMPOSER = 0x800,
        USAGE_HW_VIDEO_ENCODER = 0x10000,
        USAGE_HW_MASK = 0x71F00,
    };

    // An empty buffer; initCheck() is NO_INIT.
    GraphicBuffer();
    GraphicBuffer(uint32_t width, uint32_t height, PixelFormat format, uint32_t usage,
                  std::string requestorName = "<Unknown>");
    // Host only: rows `stride` pixels apart (stride >= width, even for
    // planar YUV), to model the padded layouts of real allocators.
    GraphicBuffer(uint32_t width, uint32_t height, PixelFormat format, uint32_t usage,
                  uint32_t stride, std::string requestorName);

    // NO_ERROR, or why the allocation failed (BAD_VALUE for a size or format
    // the host cannot hold, NO_MEMORY).
    status_t initCheck() const { return mInitCheck; }

    uint32_t getWidth() const { return (uint32_t)width; }
    uint32_t getHeight() const { return (uint32_t)height; }
    uint32_t getStride() const { return (uint32_t)stride; }
    uint64_t getUsage() const { return usage; }
    PixelFormat getPixelFormat() const { return format; }
    const std::string& getRequestorName() const { return mRequestorName; }

    // One CPU lock at a time; the usage must include a software read or
    // write bit. Luma first, then chroma, for YUV buffers.
    status_t lock(uint32_t inUsage, void** vaddr);
    // YUV buffers only.
    status_t lockYCbCr(uint32_t inUsage, android_ycbcr* ycbcr);
    // INVALID_OPERATION when the buffer is not locked.
    status_t unlock();

    ANativeWindowBuffer* getNativeBuffer() const;
    static GraphicBuffer* from(ANativeWindowBuffer* buffer);

    // Both bases declare these; sp<GraphicBuffer> uses RefBase's.
    void incStrong(const void* id) const { RefBase::incStrong(id); }
    void decStrong(const void* id) const { RefBase::decStrong(id); }

    // For the host EGL seam: an EGL image over the GPU mirror (made on first
    // use) for `display`, which must be the host graphics context's display;
    // EGL_NO_IMAGE_KHR on failure. The image must not outlive the buffer (the
    // seam's images hold a reference on theirs): its storage may be the
    // buffer's. onEglImageDestroyed() follows the image's destruction.
    EGLImageKHR createEglImage(EGLDisplay display);
    void onEglImageDestroyed();
    // For the host EGL seam: stores a width x height RGBA frame (rows
    // bottom-up when `bottomUp`) into the buffer, converted to its format;
    // parts outside the buffer are cut, parts the frame does not cover are
    // left as they were. Goes through lock/unlock, so the mirror follows.
    status_t writeRgbaFrame(const unsigned char* rgba, uint32_t frameWidth, uint32_t frameHeight,
                            bool bottomUp);
    // For the host EGL seam: the GPU has been asked to draw the buffer's
    // pixels (through an image) and `fence`, an EGL fence on `display` that
    // the buffer takes over, signals once they are there (EGL_NO_SYNC_KHR
    // when they already are). The next CPU lock reads the drawing back (or
    // shares it), and it, a new image, waitForGpuWrite() and the buffer's
    // end all wait for the fence first: no user sees the pixels before.
    void setGpuWrite(EGLDisplay display, EGLSyncKHR fence);
    // What a GPU user of an image already made waits for before sampling
    // (a device's acquire fence). NO_ERROR, or UNKNOWN_ERROR when the fence
    // could not be waited for.
    status_t waitForGpuWrite();
    // Whether such a draw may still be in flight (its fence not waited for).
    bool hasGpuWrite();

    GraphicBuffer(const GraphicBuffer&) = delete;
    GraphicBuffer& operator=(const GraphicBuffer&) = delete;

protected:
    ~GraphicBuffer() override;

private:
    friend class GraphicBufferTestSeam;

    void init(uint32_t w, uint32_t h, PixelFormat f, uint32_t inUsage, uint32_t inStride);
    static void incRef(android_native_base_t* base);
    static void decRef(android_native_base_t* base);

    std::string mRequestorName;
    status_t mInitCheck;
    std::unique_ptr<BufferStorage> mStorage;  // null unless initCheck() is NO_ERROR
};

}  // namespace android

#endif
