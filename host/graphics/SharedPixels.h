// Pixel memory that the CPU and Mesa's software rasterizer use as one: a
// memfd laid out as llvmpipe lays out the memory it exports (a small header,
// then page-aligned pixels), so that GL_EXT_memory_object_fd can import it as
// the storage of an RGBA texture. A device's gralloc gives the same thing (one
// allocation both sides map); without it every CPU write and every GPU
// rendering would cost the host a full copy on its way across.
#ifndef KIV_HOST_GRAPHICS_SHAREDPIXELS_H
#define KIV_HOST_GRAPHICS_SHAREDPIXELS_H

#include <stddef.h>
#include <stdint.h>

namespace android {

class SharedPixels {
public:
    // Bytes between rows of an RGBA texture `width` pixels wide in llvmpipe's
    // layout (4-pixel blocks, rows padded to a cache line).
    static size_t rowPitch(uint32_t width);

    // Zero-filled memory for a width x height RGBA texture; false on failure
    // (the object stays empty).
    bool allocate(uint32_t width, uint32_t height);
    void free();

    unsigned char* pixels() const { return mPixels; }
    // What the importer maps: the whole file, header included.
    size_t fileSize() const { return mFileSize; }
    // A new descriptor for an import (GL takes ownership of it); -1 on failure.
    int duplicateFd() const;
    bool empty() const { return mPixels == nullptr; }

    SharedPixels() = default;
    ~SharedPixels() { free(); }
    SharedPixels(SharedPixels&& other) noexcept;
    SharedPixels& operator=(SharedPixels&& other) noexcept;
    SharedPixels(const SharedPixels&) = delete;
    SharedPixels& operator=(const SharedPixels&) = delete;

private:
    int mFd = -1;
    void* mMapping = nullptr;
    size_t mFileSize = 0;
    unsigned char* mPixels = nullptr;
};

}  // namespace android

#endif
