// Pixel memory that the CPU and Mesa's software rasterizer use as one: a
// memfd laid out as llvmpipe lays out the memory it exports (a small header,
// then page-aligned pixels), which GL_EXT_memory_object_fd imports as the
// storage of an RGBA texture. A device's gralloc gives the same thing (one
// allocation both sides map); without it every CPU write and every GPU
// rendering would cost the host a full copy on its way across.
#ifndef KIV_HOST_GRAPHICS_SHAREDPIXELS_H
#define KIV_HOST_GRAPHICS_SHAREDPIXELS_H

#include <stddef.h>
#include <stdint.h>

#include <GLES2/gl2.h>

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

    // With a ring, the driver's mapping (the one that moves).
    unsigned char* pixels() const { return mDriverPixels != nullptr ? mDriverPixels : mPixels; }
    // What the importer maps: the whole file, header included.
    size_t fileSize() const { return mFileSize; }
    uint32_t width() const { return mWidth; }
    uint32_t height() const { return mHeight; }
    bool empty() const { return mPixels == nullptr; }

    // Gives back the memory of the first `bytes` bytes of pixels (whole
    // pages only; they read as zeros after). Cumulative: a call that reaches
    // less far than an earlier one does nothing.
    void discardBelow(size_t bytes);

    // After importTexture, for pixels written and read once in order: part k
    // of the pixels (`partBytes` bytes from k * partBytes, whole pages) lives
    // in slot k % slots of a ring that stays in memory, so that going through
    // a large picture neither allocates, zeroes nor gives back memory. The
    // CPU uses the driver's mapping from then on (found among the process's
    // mappings), the only one that moves. False when the driver's mapping
    // cannot be found (nothing changes).
    bool useRing(size_t partBytes, int slots);
    // Before part k is touched: it takes its slot, and the part that held the
    // slot before (k - slots) reads as zeros from then on. The caller makes
    // sure nobody uses that part any more, nor part k yet.
    bool takePart(int k);
    bool ringInUse() const { return mRingFd >= 0; }

    // With a context current: an RGBA texture whose storage is this memory,
    // left bound; 0 when the driver does not take it
    // (tried once per process on a small texture first, whose rows must land
    // where the CPU expects them). `memoryObject` gets the GL object that
    // holds the import: it must outlive every user of the texture's storage.
    GLuint importTexture(GLuint* memoryObject) const;
    // With a context current: deletes an imported texture, then its import.
    static void deleteImported(GLuint texture, GLuint memoryObject);
    // False once an import has failed, or while imports are not allowed.
    static bool mayImport();
    // For tests of GL transfers: whether imports may be tried at all.
    static void allowImports(bool allowed);

    SharedPixels() = default;
    ~SharedPixels() { free(); }
    SharedPixels(const SharedPixels&) = delete;
    SharedPixels& operator=(const SharedPixels&) = delete;

private:
    GLuint import(GLuint* memoryObject) const;
    static bool probe();

    // Maps part k of the pixels at `base` onto `fd` at `offset`.
    bool mapPart(unsigned char* base, int k, int fd, size_t offset, bool populate) const;
    // Moves the mapping of part `from` (its page tables with it) to part
    // `to`; false when the kernel would not.
    bool movePart(unsigned char* base, int from, int to) const;
    // Bytes of part k inside the file.
    size_t partLength(int k) const;
    unsigned char* findDriverPixels() const;

    size_t mDiscarded = 0;  // pixel bytes given back so far (whole pages)
    int mFd = -1;
    int mRingFd = -1;
    size_t mPartBytes = 0;
    int mSlots = 0;
    unsigned char* mDriverPixels = nullptr;  // the driver's mapping of mPixels
    void* mMapping = nullptr;
    size_t mFileSize = 0;
    unsigned char* mPixels = nullptr;
    uint32_t mWidth = 0;
    uint32_t mHeight = 0;
};

}  // namespace android

#endif
