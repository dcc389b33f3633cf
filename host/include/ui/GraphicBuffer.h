// android::GraphicBuffer on a Linux host: the subset the library uses.
//
// The pixels live in CPU memory (what lock()/lockYCbCr() return) in the
// buffer's own layout. Once the GPU needs the buffer (an EGL image is made
// over it) they are mirrored in an RGBA GL texture of the host graphics
// context, and the two copies are kept in step at these points:
//  - unlock() after a lock with a software-write usage sends the CPU pixels
//    to the texture (YUV converted to RGBA with the image core's full-range
//    equations), so CPU writes reach the GPU before its next use;
//  - lock()/lockYCbCr() of a buffer allocated with USAGE_HW_RENDER, while an
//    EGL image over it exists (or after the last one went away), first reads
//    the texture back (RGBA converted to the buffer's format), so GPU
//    rendering reaches the CPU. A lock on a thread with a current context
//    fences that context first; any other thread relies on the renderer
//    having flushed (glFlush, glFinish or a swap), as on a device. If the
//    CPU leaves the read-back pixels unchanged, its unlock sends nothing up.
// Texture-only buffers never read back: their CPU copy is the original and
// a YUV->RGBA->YUV round trip would lose precision.
//
// Like a device allocator, the host keeps the memory and mirror of a few
// buffers that went away after GPU use and hands them to new buffers of the
// same layout and kind, which skip fresh pages and a new texture. A recycled
// render target (USAGE_HW_RENDER) reads as zeros on both sides, as a new
// buffer does; a recycled texture-only buffer holds the bytes it came with
// (its mirror matching them) until the CPU writes it, as contents of a new
// buffer are undefined on a device. What is kept is let go when the last
// other user of the display terminates it.
#ifndef KIV_HOST_UI_GRAPHICBUFFER_H
#define KIV_HOST_UI_GRAPHICBUFFER_H

#include <stdint.h>

#include <atomic>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include <EGL/egl.h>
#include <EGL/eglext.h>
#include <nativebase/nativebase.h>
#include <system/graphics.h>
#include <ui/PixelFormat.h>
#include <utils/Errors.h>
#include <utils/RefBase.h>

namespace android {

class SharedPixels;

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

    // --- Host graphics (used by the host EGL seam and windows) ---

    // An EGL image over the GPU mirror (created on first use), for `display`,
    // which must be the display of the host graphics context. EGL_NO_IMAGE_KHR
    // on failure. The image must not outlive the buffer (the EGL seam's
    // images hold a reference on theirs): its storage may be the buffer's.
    EGLImageKHR createEglImage(EGLDisplay display);
    // Called after an image from createEglImage() was destroyed.
    void onEglImageDestroyed();
    // Stores a width x height RGBA frame (rows bottom-up when `bottomUp`)
    // into the buffer, converted to its format; parts outside the buffer are
    // cut, parts the frame does not cover are left as they were. Goes through
    // lock/unlock, so the GPU mirror follows.
    status_t writeRgbaFrame(const unsigned char* rgba, uint32_t frameWidth, uint32_t frameHeight,
                            bool bottomUp);
    // Counters for tests: transfers between the CPU copy and the mirror.
    uint32_t getUploadCount() const { return mUploadCount; }
    uint32_t getReadbackCount() const { return mReadbackCount; }
    // For tests: the CPU pixels are the GPU's storage itself (no transfers).
    bool sharesGpuStorage();
    // For tests of GL transfer failures: while false, buffers made (or
    // recycled) from then on keep their GPU storage to the driver and move
    // pixels with GL calls, as when the driver cannot share memory.
    static void allowSharedStorage(bool allowed);

    GraphicBuffer(const GraphicBuffer&) = delete;
    GraphicBuffer& operator=(const GraphicBuffer&) = delete;

protected:
    ~GraphicBuffer() override;

private:
    void init(uint32_t w, uint32_t h, PixelFormat f, uint32_t inUsage, uint32_t inStride);
    status_t lockCommon_l(uint32_t inUsage);
    // Makes the mirror if there is none yet, then runs `then` in the host
    // context (the same visit). False when either fails.
    bool ensureMirror_l(const std::function<bool()>& then);
    bool fillMirror_l(unsigned int texture, const unsigned char* rgba, bool fresh);
    bool zeroMirror_l(unsigned int texture, bool fresh);
    bool upload_l();
    bool readback_l();
    bool toRgba_l(unsigned char* rgba) const;
    bool isCompactRgba_l() const;
    // width x height RGBA staging memory (kept), or null.
    unsigned char* rgbaScratch_l();
    // The pixels to upload: the CPU copy itself, or RGBA converted into the
    // staging memory; null on failure.
    const unsigned char* rgbaForUpload_l();
    bool fromRgba_l(const unsigned char* rgba);
    // Clears the mirror to what an all-zero CPU copy converts to.
    bool clearMirror_l(unsigned int texture);
    // Whether the mirror (or the spare) is the CPU copy's own memory...
    bool shared_l() const { return mShared != nullptr && mMemoryObject != 0; }
    // ...or has storage of its own that the CPU can reach, so that transfers
    // are CPU copies and conversions instead of GL calls.
    bool mapped_l() const { return mMirrorPixels != nullptr && mMemoryObject != 0; }
    // Copies or converts the CPU copy into the mirror's mapped storage
    // (toMirror) or back.
    bool transferMapped_l(bool toMirror);

    static void incRef(android_native_base_t* base);
    static void decRef(android_native_base_t* base);

    std::string mRequestorName;
    status_t mInitCheck;
    uint32_t mFourcc;  // layout of the CPU copy (VC_FORMAT_*)
    unsigned char* mData;
    size_t mDataSize;

    std::mutex mLock;
    uint32_t mLockUsage;          // 0 when not locked
    unsigned int mMirrorTexture;  // GL name in the host graphics context, 0 when none
    // A recycled mirror that becomes mMirrorTexture on first GPU use; like
    // the mirror, it holds a user of the host graphics context.
    unsigned int mSpareTexture;
    // The CPU copy reads as zeros as far as anyone can tell (nothing was
    // written or read back since the allocation)...
    bool mZeroContent;
    // ...though for recycled memory the zeros are still to be written, at the
    // first lock that does not fill the copy itself.
    bool mZeroPending;
    // mSpareTexture already holds the CPU copy (a recycled texture-only buffer).
    bool mSpareMatches;
    // Memory the driver can take as a texture's storage (RGBA buffers whose
    // rows fall where the driver's texture rows do): mData points into it.
    std::unique_ptr<SharedPixels> mShared;
    // The mirror's own storage, when the driver took it but the CPU copy's
    // layout differs (YUV, BGRA, rows padded otherwise).
    std::unique_ptr<SharedPixels> mMirrorPixels;
    // Holds the import of mShared or mMirrorPixels by the mirror (or the
    // spare); 0 when the mirror's storage is the driver's own, reached by GL
    // transfers only.
    unsigned int mMemoryObject;
    int mImageCount;
    bool mGpuDirty;
    // The CPU copy as the last readback left it, while that lock is held: an
    // unlock that finds it unchanged has nothing to send back up.
    std::vector<unsigned char> mReadbackCopy;
    // RGBA staging between a CPU copy of another layout and the mirror.
    std::unique_ptr<unsigned char[]> mRgbaScratch;
    std::atomic<uint32_t> mUploadCount;
    std::atomic<uint32_t> mReadbackCount;
};

}  // namespace android

#endif
