#include <ui/GraphicBuffer.h>

#include <stdlib.h>
#include <string.h>
#include <sys/mman.h>

#include <memory>
#include <vector>

#include "core/egl/EglExtensions.h"
#include "core/egl/HalPixelFormat.h"
#include "host/graphics/HostGl.h"
#include "host/graphics/SharedPixels.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_image.h"
#include "vccore/vc_log.h"

namespace android {

namespace {

bool isYuv(uint32_t fourcc) {
    return fourcc == VC_FORMAT_NV21 || fourcc == VC_FORMAT_NV12 || fourcc == VC_FORMAT_YV12;
}

// Rows of each plane in the CPU copy: `rows` rows of `bytes` bytes, `pitch`
// bytes apart, starting at `offset`.
struct Plane {
    size_t offset;
    size_t pitch;
    size_t bytes;
    size_t rows;
};

// The planes of a buffer whose rows are `stride` pixels apart; with
// stride == width they are exactly the compact image-core layout.
int planesOf(uint32_t fourcc, size_t width, size_t height, size_t stride, Plane* planes) {
    if (!isYuv(fourcc)) {
        planes[0] = {0, stride * 4, width * 4, height};
        return 1;
    }
    size_t luma = stride * height;
    planes[0] = {0, stride, width, height};
    if (fourcc != VC_FORMAT_YV12) {
        planes[1] = {luma, stride, width, height / 2};
        return 2;
    }
    size_t chroma = (stride / 2) * (height / 2);
    planes[1] = {luma, stride / 2, width / 2, height / 2};
    planes[2] = {luma + chroma, stride / 2, width / 2, height / 2};
    return 3;
}

size_t bytesOf(uint32_t fourcc, size_t height, size_t stride) {
    if (!isYuv(fourcc)) return stride * height * 4;
    return stride * height + stride * (height / 2);
}

// Copies plane by plane between two layouts of the same image.
void restride(const unsigned char* src, const Plane* srcPlanes, unsigned char* dst,
              const Plane* dstPlanes, int count) {
    for (int p = 0; p < count; ++p) {
        for (size_t row = 0; row < srcPlanes[p].rows; ++row) {
            memcpy(dst + dstPlanes[p].offset + row * dstPlanes[p].pitch,
                   src + srcPlanes[p].offset + row * srcPlanes[p].pitch, srcPlanes[p].bytes);
        }
    }
}

// Scratch memory that is fully overwritten before it is read: not zeroed.
std::unique_ptr<unsigned char[]> scratch(size_t bytes) {
    return std::unique_ptr<unsigned char[]>(new (std::nothrow) unsigned char[bytes]);
}

// Deletes a mirror (and what holds its imported storage, if any) and lets go
// of the host context user it held.
void deleteMirror(GLuint texture, GLuint memoryObject) {
    HostGl::get().run([texture, memoryObject] {
        HostGl::deleteImported_l(texture, memoryObject);
        return true;
    });
    HostGl::get().release();
}

// Whether a buffer can keep its pixels where the driver keeps a texture's:
// RGBA rows exactly as far apart as the driver's.
bool canShare(uint32_t fourcc, uint32_t width, uint32_t stride) {
    return fourcc == VC_FORMAT_RGBA && (size_t)stride * 4 == SharedPixels::rowPitch(width) &&
           HostGl::mayImport();
}

// The memory and mirror of a buffer that went away after GPU use.
struct Recycled {
    uint32_t fourcc = 0;
    uint32_t width = 0;
    uint32_t height = 0;
    uint32_t stride = 0;
    bool render = false;  // allocated for USAGE_HW_RENDER
    unsigned char* data = nullptr;
    GLuint texture = 0;
    std::unique_ptr<unsigned char[]> rgbaScratch;
    std::unique_ptr<SharedPixels> shared;        // data points into it, when set
    std::unique_ptr<SharedPixels> mirrorPixels;  // the texture's own storage, when set
    GLuint memoryObject = 0;                     // the import of either

    size_t bytes() const {
        // The CPU copy, the mirror and the staging memory, if any; shared
        // memory is both of the first two.
        size_t rgba = (size_t)width * height * 4;
        size_t staging = rgbaScratch != nullptr ? rgba : 0;
        if (memoryObject != 0 && shared != nullptr) return shared->fileSize() + staging;
        size_t mirror = mirrorPixels != nullptr ? mirrorPixels->fileSize() : rgba;
        return bytesOf(fourcc, height, stride) + mirror + staging;
    }
    void free() {
        if (texture != 0) deleteMirror(texture, memoryObject);
        if (shared == nullptr) ::free(data);
        shared.reset();
        mirrorPixels.reset();
        texture = 0;
        memoryObject = 0;
        data = nullptr;
    }
};

// A few recycled buffers, the most recent last. Fresh memory costs a page
// fault per page and a new texture a fresh allocation in the driver: with
// 12-megapixel pictures that is tens of milliseconds a buffer, against at
// most zeroing it again for a recycled one.
class Recycler {
public:
    static Recycler& get() {
        // Never destroyed: buffers may go away in static destructors.
        static Recycler* instance = new Recycler();
        return *instance;
    }

    // Keeps `entry` (false when it cannot; the caller frees it). Only while
    // someone else uses the display: the host context must not outlive its
    // last user for the sake of buffers nobody may ask for again. (Checked
    // under the lock, so an eglTerminate that drains cannot slip in between.)
    bool keep(Recycled& entry) {
        std::vector<Recycled> evicted;
        bool kept = false;
        {
            std::lock_guard<std::mutex> guard(mLock);
            size_t bytes = entry.bytes();
            if (bytes <= kMaxBytes && HostGl::get().displayHasOtherUsers()) {
                while (!mEntries.empty() &&
                       (mEntries.size() >= kMaxEntries || mBytes + bytes > kMaxBytes)) {
                    mBytes -= mEntries.front().bytes();
                    evicted.push_back(std::move(mEntries.front()));
                    mEntries.erase(mEntries.begin());
                }
                mBytes += bytes;
                mEntries.push_back(std::move(entry));
                kept = true;
            }
        }
        for (Recycled& e : evicted) e.free();
        return kept;
    }

    bool take(uint32_t fourcc, uint32_t w, uint32_t h, uint32_t stride, bool render,
              Recycled* out) {
        std::lock_guard<std::mutex> guard(mLock);
        const bool imports = HostGl::mayImport();
        for (size_t i = mEntries.size(); i-- > 0;) {
            Recycled& e = mEntries[i];
            if (e.fourcc == fourcc && e.width == w && e.height == h && e.stride == stride &&
                e.render == render && (imports || e.memoryObject == 0)) {
                mBytes -= e.bytes();
                *out = std::move(e);
                mEntries.erase(mEntries.begin() + (ptrdiff_t)i);
                return true;
            }
        }
        return false;
    }

    // Frees everything kept (no lock held while freeing: that uses the host
    // context and may end it).
    static void drain() {
        std::vector<Recycled> all;
        {
            Recycler& self = get();
            std::lock_guard<std::mutex> guard(self.mLock);
            all.swap(self.mEntries);
            self.mBytes = 0;
        }
        for (Recycled& e : all) e.free();
    }

private:
    Recycler() { HostGl::setDisplayIdleHook(&Recycler::drain); }

    static constexpr size_t kMaxEntries = 4;
    static constexpr size_t kMaxBytes = (size_t)384 << 20;

    std::mutex mLock;
    std::vector<Recycled> mEntries;
    size_t mBytes = 0;
};

// At least `bytes` of read-only zeros: an untouched anonymous mapping, all of
// it backed by the kernel's one zero page. Grown as needed, never freed; only
// used in the host context (under its lock).
const unsigned char* zeroPages_l(size_t bytes) {
    static void* pages = nullptr;
    static size_t size = 0;
    if (bytes > size) {
        if (pages != nullptr) munmap(pages, size);
        pages = mmap(nullptr, bytes, PROT_READ, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
        size = pages == MAP_FAILED ? 0 : bytes;
        if (pages == MAP_FAILED) pages = nullptr;
    }
    return static_cast<const unsigned char*>(pages);
}

// The RGBA colour an all-zero CPU copy of `fourcc` converts to.
bool zeroColour(uint32_t fourcc, unsigned char rgba[4]) {
    memset(rgba, 0, 4);
    if (!isYuv(fourcc)) return true;
    unsigned char zeros[2 * 2 * 2] = {};  // a 2x2 picture of any 4:2:0 layout
    unsigned char out[2 * 2 * 4];
    VCImage* in = VCImage_createWrap(zeros, 2, 2, fourcc, 0, 0);
    VCImage* converted = VCImage_createWrap(out, 2, 2, VC_FORMAT_RGBA, 0, 0);
    bool ok = in != nullptr && converted != nullptr && VCImage_convert(in, converted) == 0;
    VCImage_destroy(in);
    VCImage_destroy(converted);
    if (ok) memcpy(rgba, out, 4);
    return ok;
}

}  // namespace

GraphicBuffer::GraphicBuffer()
    : mRequestorName("<Unknown>"),
      mInitCheck(NO_INIT),
      mFourcc(0),
      mData(nullptr),
      mDataSize(0),
      mLockUsage(0),
      mMirrorTexture(0),
      mSpareTexture(0),
      mZeroContent(true),
      mZeroPending(false),
      mSpareMatches(false),
      mMemoryObject(0),
      mImageCount(0),
      mGpuDirty(false),
      mUploadCount(0),
      mReadbackCount(0) {
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

    mFourcc = HalPixelFormat::fourccOf(f, false);
    // 4:2:0 layouts need even sizes; planar chroma rows need an even stride.
    bool bad = mFourcc == 0 || w == 0 || h == 0 || w > 16384 || h > 16384 || inStride < w ||
               inStride > 16384 || (isYuv(mFourcc) && ((w | h | inStride) & 1) != 0);
    if (bad) {
        VF_LogMsg(VF_LOG_ERROR, "GraphicBuffer: cannot allocate %ux%u format %d (stride %u)", w, h,
                  f, inStride);
        mInitCheck = BAD_VALUE;
        return;
    }
    mDataSize = bytesOf(mFourcc, h, inStride);
    Recycled recycled;
    bool render = (inUsage & USAGE_HW_RENDER) != 0;
    if ((inUsage & USAGE_HW_MASK) != 0 &&
        Recycler::get().take(mFourcc, w, h, inStride, render, &recycled)) {
        mData = recycled.data;
        mSpareTexture = recycled.texture;
        mRgbaScratch = std::move(recycled.rgbaScratch);
        mShared = std::move(recycled.shared);
        mMirrorPixels = std::move(recycled.mirrorPixels);
        mMemoryObject = recycled.memoryObject;
        // What the GPU renders into starts clean, so that nothing drawn for
        // one buffer ever shows in another. A texture-only buffer keeps the
        // bytes it gets, and its mirror (their upload) with them, until the
        // CPU writes it: a new buffer's contents are undefined on a device too.
        mZeroContent = render;
        if (shared_l()) {
            // One storage for both sides: cleared now, both sides at once.
            if (render) memset(mData, 0, mDataSize);
            mSpareMatches = true;
        } else {
            mZeroPending = render;
            mSpareMatches = !render;
        }
    } else if ((inUsage & USAGE_HW_MASK) != 0 && canShare(mFourcc, w, inStride)) {
        // Fresh memory reads as zeros, as calloc's does.
        std::unique_ptr<SharedPixels> shared(new (std::nothrow) SharedPixels());
        if (shared != nullptr && shared->allocate(w, h)) {
            mData = shared->pixels();
            mShared = std::move(shared);
        } else {
            mData = static_cast<unsigned char*>(calloc(1, mDataSize));
        }
    } else {
        mData = static_cast<unsigned char*>(calloc(1, mDataSize));
    }
    if (mData == nullptr) {
        mInitCheck = NO_MEMORY;
        return;
    }
    mInitCheck = NO_ERROR;
}

GraphicBuffer::~GraphicBuffer() {
    GLuint texture = mMirrorTexture != 0 ? mMirrorTexture : mSpareTexture;
    // Kept only when the mirror holds the CPU copy's last unlocked state.
    if (texture != 0 && mData != nullptr && mLockUsage == 0) {
        Recycled entry;
        entry.render = (usage & USAGE_HW_RENDER) != 0;
        entry.fourcc = mFourcc;
        entry.width = (uint32_t)width;
        entry.height = (uint32_t)height;
        entry.stride = (uint32_t)stride;
        entry.data = mData;
        entry.texture = texture;
        entry.rgbaScratch = std::move(mRgbaScratch);
        entry.shared = std::move(mShared);
        entry.mirrorPixels = std::move(mMirrorPixels);
        entry.memoryObject = mMemoryObject;
        // The next owner reaches the storage from the CPU: nothing may still
        // draw from or into it then.
        if (entry.memoryObject != 0 && !HostGl::get().waitForGpu()) {
            entry.free();
            return;
        }
        if (Recycler::get().keep(entry)) return;
        entry.free();
        return;
    }
    if (texture != 0) deleteMirror(texture, mMemoryObject);
    if (mShared == nullptr) free(mData);
}

void GraphicBuffer::allowSharedStorage(bool allowed) {
    HostGl::allowImports(allowed);
}

bool GraphicBuffer::sharesGpuStorage() {
    std::lock_guard<std::mutex> guard(mLock);
    return shared_l() && mMirrorTexture != 0;
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

status_t GraphicBuffer::lockCommon_l(uint32_t inUsage) {
    if (mInitCheck != NO_ERROR) return NO_INIT;
    if ((inUsage & USAGE_SOFTWARE_MASK) == 0) return BAD_VALUE;
    if (mLockUsage != 0) return INVALID_OPERATION;
    const bool cpuWrites = (inUsage & USAGE_SW_WRITE_MASK) != 0;
    if (shared_l()) {
        // One storage: the GPU must be done rendering into it before the CPU
        // reads, and done sampling it before the CPU writes.
        bool gpuWrote = (usage & USAGE_HW_RENDER) != 0 && (mImageCount > 0 || mGpuDirty);
        if ((gpuWrote || (cpuWrites && mImageCount > 0)) && !HostGl::get().waitForGpu()) {
            return UNKNOWN_ERROR;
        }
        mGpuDirty = false;
        if (cpuWrites) mZeroContent = false;
        mLockUsage = inUsage;
        return NO_ERROR;
    }
    // GPU rendering into the mirror reaches the CPU copy here.
    bool readback =
        mMirrorTexture != 0 && (usage & USAGE_HW_RENDER) != 0 && (mImageCount > 0 || mGpuDirty);
    // Recycled memory gets its zeros unless the readback fills every byte.
    if (mZeroPending && !(readback && stride == width)) {
        memset(mData, 0, mDataSize);
        mZeroPending = false;
    }
    if (readback) {
        if (!readback_l()) return UNKNOWN_ERROR;
        mZeroPending = false;
        mZeroContent = false;
        // Kept to spot an unchanged copy at unlock: sending it back up would
        // cost a transfer, and for YUV would replace the rendered RGBA with a
        // converted round trip of it.
        if ((inUsage & USAGE_SW_WRITE_MASK) != 0) {
            mReadbackCopy.assign(mData, mData + mDataSize);
        }
        mGpuDirty = false;
    }
    if (cpuWrites) {
        mZeroContent = false;
        // A recycled mirror no longer holds what the CPU copy will.
        mSpareMatches = false;
    }
    mLockUsage = inUsage;
    return NO_ERROR;
}

status_t GraphicBuffer::lock(uint32_t inUsage, void** vaddr) {
    if (vaddr == nullptr) return BAD_VALUE;
    std::lock_guard<std::mutex> guard(mLock);
    status_t status = lockCommon_l(inUsage);
    *vaddr = status == NO_ERROR ? mData : nullptr;
    return status;
}

status_t GraphicBuffer::lockYCbCr(uint32_t inUsage, android_ycbcr* ycbcr) {
    if (ycbcr == nullptr) return BAD_VALUE;
    std::lock_guard<std::mutex> guard(mLock);
    if (mInitCheck == NO_ERROR && !isYuv(mFourcc)) return BAD_VALUE;
    status_t status = lockCommon_l(inUsage);
    if (status != NO_ERROR) return status;
    memset(ycbcr, 0, sizeof(*ycbcr));
    unsigned char* chroma = mData + (size_t)stride * height;
    ycbcr->y = mData;
    ycbcr->ystride = stride;
    if (mFourcc == VC_FORMAT_YV12) {
        ycbcr->cstride = stride / 2;
        ycbcr->chroma_step = 1;
        ycbcr->cr = chroma;
        ycbcr->cb = chroma + (size_t)(stride / 2) * (height / 2);
    } else {
        ycbcr->cstride = stride;
        ycbcr->chroma_step = 2;
        ycbcr->cb = mFourcc == VC_FORMAT_NV12 ? chroma : chroma + 1;
        ycbcr->cr = mFourcc == VC_FORMAT_NV12 ? chroma + 1 : chroma;
    }
    return NO_ERROR;
}

status_t GraphicBuffer::unlock() {
    std::lock_guard<std::mutex> guard(mLock);
    if (mLockUsage == 0) return INVALID_OPERATION;
    bool wrote = (mLockUsage & USAGE_SW_WRITE_MASK) != 0 && !shared_l();
    mLockUsage = 0;
    if (wrote && !mReadbackCopy.empty() &&
        memcmp(mReadbackCopy.data(), mData, mReadbackCopy.size()) == 0) {
        wrote = false;  // the mirror already holds exactly this
    }
    mReadbackCopy.clear();
    // CPU writes reach the GPU before its next use.
    if (wrote && mMirrorTexture != 0 && !upload_l()) return UNKNOWN_ERROR;
    return NO_ERROR;
}

bool GraphicBuffer::toRgba_l(unsigned char* rgba) const {
    Plane own[3];
    Plane compact[3];
    int count = planesOf(mFourcc, width, height, stride, own);
    planesOf(mFourcc, width, height, width, compact);
    if (mFourcc == VC_FORMAT_RGBA) {
        restride(mData, own, rgba, compact, count);
        return true;
    }
    std::unique_ptr<unsigned char[]> packed;
    unsigned char* source = mData;
    if (stride != width) {
        packed = scratch(bytesOf(mFourcc, height, width));
        if (packed == nullptr) return false;
        restride(mData, own, packed.get(), compact, count);
        source = packed.get();
    }
    VCImage* in = VCImage_createWrap(source, width, height, mFourcc, 0, 0);
    VCImage* out = VCImage_createWrap(rgba, width, height, VC_FORMAT_RGBA, 0, 0);
    int result =
        (in != nullptr && out != nullptr) ? VCImage_convert(in, out) : VC_ERROR_ALLOC_FAILED;
    VCImage_destroy(in);
    VCImage_destroy(out);
    if (result != 0) {
        VF_LogMsg(VF_LOG_ERROR, "GraphicBuffer: cannot convert %4.4s to RGBA (%d)",
                  (const char*)&mFourcc, result);
    }
    return result == 0;
}

bool GraphicBuffer::fromRgba_l(const unsigned char* rgba) {
    Plane own[3];
    Plane compact[3];
    int count = planesOf(mFourcc, width, height, stride, own);
    planesOf(mFourcc, width, height, width, compact);
    if (mFourcc == VC_FORMAT_RGBA) {
        restride(rgba, compact, mData, own, count);
        return true;
    }
    // A compact buffer takes the conversion in place.
    std::unique_ptr<unsigned char[]> packed;
    unsigned char* target = mData;
    if (stride != width) {
        packed = scratch(bytesOf(mFourcc, height, width));
        if (packed == nullptr) return false;
        target = packed.get();
    }
    VCImage* in =
        VCImage_createWrap(const_cast<unsigned char*>(rgba), width, height, VC_FORMAT_RGBA, 0, 0);
    VCImage* out = VCImage_createWrap(target, width, height, mFourcc, 0, 0);
    int result =
        (in != nullptr && out != nullptr) ? VCImage_convert(in, out) : VC_ERROR_ALLOC_FAILED;
    VCImage_destroy(in);
    VCImage_destroy(out);
    if (result != 0) {
        VF_LogMsg(VF_LOG_ERROR, "GraphicBuffer: cannot convert RGBA to %4.4s (%d)",
                  (const char*)&mFourcc, result);
        return false;
    }
    if (packed != nullptr) restride(packed.get(), compact, mData, own, count);
    return true;
}

bool GraphicBuffer::isCompactRgba_l() const {
    return mFourcc == VC_FORMAT_RGBA && stride == width;
}

unsigned char* GraphicBuffer::rgbaScratch_l() {
    // Kept for the buffer's life: a buffer is usually transferred many times,
    // and fresh memory of this size costs a page fault per page.
    if (mRgbaScratch == nullptr) mRgbaScratch = scratch((size_t)width * height * 4);
    return mRgbaScratch.get();
}

const unsigned char* GraphicBuffer::rgbaForUpload_l() {
    // A compact RGBA copy is already what the texture takes.
    if (isCompactRgba_l()) return mData;
    unsigned char* rgba = rgbaScratch_l();
    if (rgba == nullptr || !toRgba_l(rgba)) return nullptr;
    return rgba;
}

bool GraphicBuffer::ensureMirror_l(const std::function<bool()>& then) {
    HostGl& gl = HostGl::get();
    if (mMirrorTexture != 0) return gl.run(then);
    // A recycled mirror already counts as a user of the host context.
    GLuint texture = mSpareTexture;
    if (texture == 0 && !gl.acquire()) return false;
    // A recycled mirror may already hold the CPU copy; an untouched buffer
    // needs no conversion: its mirror gets what zeros convert to. Shared
    // memory needs nothing at all: it is the mirror's storage.
    const bool matches = texture != 0 && mSpareMatches;
    bool made = false;
    bool ok = gl.run([&] {
        GLuint memory = 0;
        if (texture == 0 && mShared != nullptr) {
            texture = gl.importTexture_l(*mShared, (uint32_t)width, (uint32_t)height, &memory);
            if (texture != 0) {
                mMirrorTexture = texture;
                mMemoryObject = memory;
                made = true;
                return then();
            }
        }
        // Storage of its own the CPU can reach, when the driver takes it.
        bool imported = false;
        if (texture == 0 && mShared == nullptr && HostGl::mayImport()) {
            std::unique_ptr<SharedPixels> storage(new (std::nothrow) SharedPixels());
            if (storage != nullptr && storage->allocate((uint32_t)width, (uint32_t)height)) {
                texture = gl.importTexture_l(*storage, (uint32_t)width, (uint32_t)height, &memory);
            }
            if (texture != 0) {
                mMirrorPixels = std::move(storage);
                mMemoryObject = memory;
                imported = true;
            }
        }
        const bool fresh = texture == 0;
        bool filled = false;
        if (imported) {
            // Imported storage starts as zeros (RGBA zeros already); other
            // contents are written into it from the CPU.
            filled =
                mZeroContent ? !isYuv(mFourcc) || clearMirror_l(texture) : transferMapped_l(true);
        } else {
            const unsigned char* rgba = (matches || mZeroContent) ? nullptr : rgbaForUpload_l();
            if (matches || mZeroContent || rgba != nullptr) {
                if (fresh) {
                    glGenTextures(1, &texture);
                    // Level 0 only (no mipmap filter): the texture must be
                    // complete to become an EGL image.
                    HostGl::setMirrorSampling_l(texture);
                }
                filled = matches || (rgba != nullptr ? fillMirror_l(texture, rgba, fresh)
                                                     : zeroMirror_l(texture, fresh));
            }
        }
        made = filled && glGetError() == GL_NO_ERROR;
        if (!made) {
            VF_LogMsg(VF_LOG_ERROR, "GraphicBuffer: mirror texture %dx%d failed", width, height);
            if (imported) {
                HostGl::deleteImported_l(texture, mMemoryObject);
                mMirrorPixels.reset();
                mMemoryObject = 0;
            } else if (fresh && texture != 0) {
                glDeleteTextures(1, &texture);
            }
            return false;
        }
        mMirrorTexture = texture;
        mSpareTexture = 0;
        return then();
    });
    // A recycled mirror that could not be filled stays with the buffer (and
    // its user with it).
    if (!made && mSpareTexture == 0) gl.release();
    return ok;
}

bool GraphicBuffer::fillMirror_l(unsigned int texture, const unsigned char* rgba, bool fresh) {
    glBindTexture(GL_TEXTURE_2D, texture);
    glPixelStorei(GL_UNPACK_ALIGNMENT, 4);
    if (fresh) {
        glTexImage2D(GL_TEXTURE_2D, 0, GL_RGBA, width, height, 0, GL_RGBA, GL_UNSIGNED_BYTE, rgba);
    } else {
        glTexSubImage2D(GL_TEXTURE_2D, 0, 0, 0, width, height, GL_RGBA, GL_UNSIGNED_BYTE, rgba);
    }
    glBindTexture(GL_TEXTURE_2D, 0);
    return true;
}

bool GraphicBuffer::zeroMirror_l(unsigned int texture, bool fresh) {
    // RGBA zeros come from untouched pages (one shared physical page, so the
    // upload costs only its writes); YUV zeros convert to a colour, cleared.
    const unsigned char* zeros = isYuv(mFourcc) ? nullptr : zeroPages_l((size_t)width * height * 4);
    if (zeros != nullptr) return fillMirror_l(texture, zeros, fresh);
    if (fresh) {
        glBindTexture(GL_TEXTURE_2D, texture);
        glTexImage2D(GL_TEXTURE_2D, 0, GL_RGBA, width, height, 0, GL_RGBA, GL_UNSIGNED_BYTE,
                     nullptr);
        glBindTexture(GL_TEXTURE_2D, 0);
    }
    return clearMirror_l(texture);
}

bool GraphicBuffer::clearMirror_l(unsigned int texture) {
    unsigned char colour[4];
    if (!zeroColour(mFourcc, colour)) return false;
    HostGl& gl = HostGl::get();
    glBindFramebuffer(GL_FRAMEBUFFER, gl.framebuffer_l());
    glFramebufferTexture2D(GL_FRAMEBUFFER, GL_COLOR_ATTACHMENT0, GL_TEXTURE_2D, texture, 0);
    bool complete = glCheckFramebufferStatus(GL_FRAMEBUFFER) == GL_FRAMEBUFFER_COMPLETE;
    if (complete) {
        glClearColor(colour[0] / 255.0f, colour[1] / 255.0f, colour[2] / 255.0f,
                     colour[3] / 255.0f);
        glClear(GL_COLOR_BUFFER_BIT);
    }
    glFramebufferTexture2D(GL_FRAMEBUFFER, GL_COLOR_ATTACHMENT0, GL_TEXTURE_2D, 0, 0);
    glBindFramebuffer(GL_FRAMEBUFFER, 0);
    return complete;
}

bool GraphicBuffer::transferMapped_l(bool toMirror) {
    unsigned char* mirror = mMirrorPixels->pixels();
    const size_t pitch = SharedPixels::rowPitch((uint32_t)width);
    const size_t row = (size_t)width * 4;
    const Plane mirrorRows = {0, pitch, row, (size_t)height};
    const Plane packed = {0, row, row, (size_t)height};
    if (mFourcc == VC_FORMAT_RGBA) {
        Plane own[1];
        planesOf(mFourcc, width, height, stride, own);
        if (toMirror) {
            restride(mData, own, mirror, &mirrorRows, 1);
        } else {
            restride(mirror, &mirrorRows, mData, own, 1);
        }
        return true;
    }
    // Converted straight into (or out of) the mirror when its rows are packed.
    if (pitch == row) return toMirror ? toRgba_l(mirror) : fromRgba_l(mirror);
    unsigned char* rgba = rgbaScratch_l();
    if (rgba == nullptr) return false;
    if (toMirror) {
        if (!toRgba_l(rgba)) return false;
        restride(rgba, &packed, mirror, &mirrorRows, 1);
        return true;
    }
    restride(mirror, &mirrorRows, rgba, &packed, 1);
    return fromRgba_l(rgba);
}

bool GraphicBuffer::upload_l() {
    if (mapped_l()) {
        // Once the GPU is done sampling the mirror, the CPU writes it.
        if (!HostGl::get().waitForGpu() || !transferMapped_l(true)) return false;
        ++mUploadCount;
        return true;
    }
    const unsigned char* rgba = rgbaForUpload_l();
    if (rgba == nullptr) return false;
    GLuint texture = mMirrorTexture;
    bool ok = HostGl::get().run([&] {
        glBindTexture(GL_TEXTURE_2D, texture);
        glPixelStorei(GL_UNPACK_ALIGNMENT, 4);
        glTexSubImage2D(GL_TEXTURE_2D, 0, 0, 0, width, height, GL_RGBA, GL_UNSIGNED_BYTE, rgba);
        glBindTexture(GL_TEXTURE_2D, 0);
        return glGetError() == GL_NO_ERROR;
    });
    if (ok) ++mUploadCount;
    return ok;
}

bool GraphicBuffer::readback_l() {
    if (mapped_l()) {
        // Once the GPU is done rendering into the mirror, the CPU reads it.
        if (!HostGl::get().waitForGpu() || !transferMapped_l(false)) {
            VF_LogMsg(VF_LOG_ERROR, "GraphicBuffer: cannot read the GPU copy back");
            return false;
        }
        ++mReadbackCount;
        return true;
    }
    // A compact RGBA copy is read straight into; other layouts convert after.
    unsigned char* rgba = isCompactRgba_l() ? mData : rgbaScratch_l();
    if (rgba == nullptr) return false;
    GLuint texture = mMirrorTexture;
    bool ok = HostGl::get().run([&] {
        HostGl& gl = HostGl::get();
        glBindFramebuffer(GL_FRAMEBUFFER, gl.framebuffer_l());
        glFramebufferTexture2D(GL_FRAMEBUFFER, GL_COLOR_ATTACHMENT0, GL_TEXTURE_2D, texture, 0);
        bool complete = glCheckFramebufferStatus(GL_FRAMEBUFFER) == GL_FRAMEBUFFER_COMPLETE;
        if (complete) {
            glPixelStorei(GL_PACK_ALIGNMENT, 4);
            glReadPixels(0, 0, width, height, GL_RGBA, GL_UNSIGNED_BYTE, rgba);
        }
        glFramebufferTexture2D(GL_FRAMEBUFFER, GL_COLOR_ATTACHMENT0, GL_TEXTURE_2D, 0, 0);
        glBindFramebuffer(GL_FRAMEBUFFER, 0);
        return complete && glGetError() == GL_NO_ERROR;
    });
    if (!ok) {
        VF_LogMsg(VF_LOG_ERROR, "GraphicBuffer: cannot read the GPU copy back");
        return false;
    }
    ++mReadbackCount;
    return rgba == mData || fromRgba_l(rgba);
}

EGLImageKHR GraphicBuffer::createEglImage(EGLDisplay display) {
    std::lock_guard<std::mutex> guard(mLock);
    if (mInitCheck != NO_ERROR) return EGL_NO_IMAGE_KHR;
    HostGl& gl = HostGl::get();
    const auto createImage = EglExtensions::get().eglCreateImageKHR;
    const EGLint attribs[] = {EGL_GL_TEXTURE_LEVEL_KHR, 0, EGL_IMAGE_PRESERVED_KHR, EGL_TRUE,
                              EGL_NONE};
    EGLImageKHR image = EGL_NO_IMAGE_KHR;
    // One visit to the host context makes the mirror (if needed) and the image.
    ensureMirror_l([&] {
        if (display != gl.display()) {
            VF_LogMsg(VF_LOG_ERROR, "GraphicBuffer: EGL image asked for another display");
            return false;
        }
        image = createImage(gl.display(), gl.context(), EGL_GL_TEXTURE_2D_KHR,
                            (EGLClientBuffer)(uintptr_t)mMirrorTexture, attribs);
        return image != EGL_NO_IMAGE_KHR;
    });
    if (image != EGL_NO_IMAGE_KHR) ++mImageCount;
    return image;
}

void GraphicBuffer::onEglImageDestroyed() {
    std::lock_guard<std::mutex> guard(mLock);
    if (mImageCount > 0) --mImageCount;
    // What was rendered through the image is still to be read back.
    if ((usage & USAGE_HW_RENDER) != 0) mGpuDirty = true;
}

status_t GraphicBuffer::writeRgbaFrame(const unsigned char* rgba, uint32_t frameWidth,
                                       uint32_t frameHeight, bool bottomUp) {
    if (rgba == nullptr) return BAD_VALUE;
    void* ignored = nullptr;
    status_t status = lock(USAGE_SW_READ_OFTEN | USAGE_SW_WRITE_OFTEN, &ignored);
    if (status != NO_ERROR) return status;
    {
        std::lock_guard<std::mutex> guard(mLock);
        size_t w = (size_t)width;
        size_t h = (size_t)height;
        std::vector<unsigned char> full(w * h * 4);
        bool ok = mFourcc == VC_FORMAT_RGBA || toRgba_l(full.data());
        if (mFourcc == VC_FORMAT_RGBA) {
            for (size_t row = 0; row < h; ++row) {
                memcpy(&full[row * w * 4], mData + row * stride * 4, w * 4);
            }
        }
        size_t copyWidth = frameWidth < w ? frameWidth : w;
        size_t copyHeight = frameHeight < h ? frameHeight : h;
        for (size_t row = 0; ok && row < copyHeight; ++row) {
            size_t source = bottomUp ? frameHeight - 1 - row : row;
            memcpy(&full[row * w * 4], rgba + source * frameWidth * 4, copyWidth * 4);
        }
        if (!ok || !fromRgba_l(full.data())) status = UNKNOWN_ERROR;
    }
    status_t unlocked = unlock();
    return status != NO_ERROR ? status : unlocked;
}

}  // namespace android
