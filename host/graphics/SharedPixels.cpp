#include "host/graphics/SharedPixels.h"

#include <fcntl.h>
#include <linux/falloc.h>
#include <stdio.h>
#include <string.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>

#include "core/egl/EglExtensions.h"
#include "vccore/vc_log.h"

namespace android {

namespace {

// What llvmpipe checks before it maps an imported descriptor: the file's
// size, where the pixels start, and the first 16 bytes of the SHA-1 of its
// driver id ("llvmpipe" in a release build). Another driver or build refuses
// the import, and the host falls back to copying.
struct Header {
    size_t size;
    size_t offset;
    uint8_t driverId[16];
};
const uint8_t kLlvmpipeId[16] = {0x6c, 0xb9, 0xee, 0x07, 0x4a, 0x0b, 0xad, 0x7b,
                                 0x01, 0x2e, 0x1b, 0xe9, 0x69, 0x7e, 0x53, 0x0f};

size_t alignUp(size_t value, size_t alignment) {
    return (value + alignment - 1) / alignment * alignment;
}

// Whether textures can take shared memory as storage: unknown until the
// first import tries, then settled for the process (one driver per process).
enum ImportState { IMPORT_UNKNOWN, IMPORT_WORKS, IMPORT_FAILS };
std::atomic<int> gImportState{IMPORT_UNKNOWN};
std::atomic<bool> gImportAllowed{true};

// With a context current: whether it can take imported memory as texture storage.
bool memoryObjectsPresent() {
    static const bool present = [] {
        const EglExtensions& ext = EglExtensions::get();
        return EglExtensions::hasGl("GL_EXT_memory_object_fd") &&
               ext.glCreateMemoryObjectsEXT != nullptr && ext.glDeleteMemoryObjectsEXT != nullptr &&
               ext.glImportMemoryFdEXT != nullptr && ext.glTexStorageMem2DEXT != nullptr;
    }();
    return present;
}

}  // namespace

// A 5x3 texture whose rows are padded, each texel its own value written by
// the CPU and read back by GL: a wrong row pitch or row order shows as the
// wrong values. (Reading costs nothing; a first draw or scissored clear
// would cost a shader compile.)
bool SharedPixels::probe() {
    const uint32_t w = 5, h = 3;
    SharedPixels pixels;
    if (!pixels.allocate(w, h)) return false;
    const size_t pitch = SharedPixels::rowPitch(w);
    for (uint32_t row = 0; row < h; ++row) {
        for (uint32_t i = 0; i < w * 4; ++i)
            pixels.pixels()[row * pitch + i] = (uint8_t)(row * 40 + i + 1);
    }
    GLuint memory = 0;
    GLuint texture = pixels.import(&memory);
    if (texture == 0) return false;
    GLuint framebuffer = 0;
    glGenFramebuffers(1, &framebuffer);
    glBindFramebuffer(GL_FRAMEBUFFER, framebuffer);
    glFramebufferTexture2D(GL_FRAMEBUFFER, GL_COLOR_ATTACHMENT0, GL_TEXTURE_2D, texture, 0);
    bool ok = glCheckFramebufferStatus(GL_FRAMEBUFFER) == GL_FRAMEBUFFER_COMPLETE;
    unsigned char read[h][w * 4] = {};
    // Rows of 20 bytes: packed under any pack alignment.
    if (ok) glReadPixels(0, 0, (GLsizei)w, (GLsizei)h, GL_RGBA, GL_UNSIGNED_BYTE, read);
    glBindFramebuffer(GL_FRAMEBUFFER, 0);
    glDeleteFramebuffers(1, &framebuffer);
    for (uint32_t row = 0; ok && row < h; ++row)
        ok = memcmp(read[row], pixels.pixels() + row * pitch, w * 4) == 0;
    SharedPixels::deleteImported(texture, memory);
    while (glGetError() != GL_NO_ERROR) {
    }
    return ok;
}

size_t SharedPixels::rowPitch(uint32_t width) {
    return alignUp(alignUp(width, 4) * 4, 64);
}

bool SharedPixels::allocate(uint32_t width, uint32_t height) {
    free();
    if (width == 0 || height == 0) return false;
    const size_t page = (size_t)sysconf(_SC_PAGESIZE);
    // The header, then the offset again right before the pixels (where
    // llvmpipe looks for it when it lets go of the mapping).
    const size_t offset = alignUp(sizeof(Header) + sizeof(size_t), page);
    const size_t pixelBytes = alignUp(rowPitch(width) * alignUp(height, 4), 64);
    const size_t size = alignUp(offset + pixelBytes, page);
    int fd = memfd_create("kiv-graphic-buffer", MFD_CLOEXEC);
    if (fd < 0) return false;
    void* mapping = MAP_FAILED;
    if (ftruncate(fd, (off_t)size) == 0) {
        mapping = mmap(nullptr, size, PROT_READ | PROT_WRITE, MAP_SHARED, fd, 0);
    }
    if (mapping == MAP_FAILED) {
        close(fd);
        return false;
    }
    Header* header = static_cast<Header*>(mapping);
    header->size = size;
    header->offset = offset;
    memcpy(header->driverId, kLlvmpipeId, sizeof(kLlvmpipeId));
    unsigned char* pixels = static_cast<unsigned char*>(mapping) + offset;
    memcpy(pixels - sizeof(size_t), &offset, sizeof(size_t));
    mFd = fd;
    mMapping = mapping;
    mFileSize = size;
    mPixels = pixels;
    mWidth = width;
    mHeight = height;
    return true;
}

void SharedPixels::discardBelow(size_t bytes) {
    // A ring keeps its memory; the file under it holds none.
    if (mPixels == nullptr || mRingFd >= 0) return;
    const size_t page = (size_t)sysconf(_SC_PAGESIZE);
    const size_t start = (size_t)(mPixels - static_cast<unsigned char*>(mMapping));
    // Pixels start on a page; only pages wholly below the point go.
    const size_t end = bytes / page * page;
    if (end <= mDiscarded) return;
    if (fallocate(mFd, FALLOC_FL_PUNCH_HOLE | FALLOC_FL_KEEP_SIZE, (off_t)(start + mDiscarded),
                  (off_t)(end - mDiscarded)) == 0) {
        mDiscarded = end;
    }
}

// llvmpipe maps an imported file once, whole, for as long as the import
// lives: the one other mapping of our file from its start at its full size.
unsigned char* SharedPixels::findDriverPixels() const {
    struct stat st;
    if (fstat(mFd, &st) != 0) return nullptr;
    FILE* maps = fopen("/proc/self/maps", "re");
    if (maps == nullptr) return nullptr;
    unsigned char* found = nullptr;
    int count = 0;
    char line[512];
    while (fgets(line, sizeof(line), maps) != nullptr) {
        unsigned long start = 0, end = 0, offset = 0, inode = 0;
        unsigned int major = 0, minor = 0;
        if (sscanf(line, "%lx-%lx %*s %lx %x:%x %lu", &start, &end, &offset, &major, &minor,
                   &inode) != 6 ||
            inode != st.st_ino || makedev(major, minor) != st.st_dev || offset != 0 ||
            end - start != mFileSize || (void*)start == mMapping) {
            continue;
        }
        found = (unsigned char*)start + (mPixels - static_cast<unsigned char*>(mMapping));
        ++count;
    }
    fclose(maps);
    return count == 1 ? found : nullptr;
}

size_t SharedPixels::partLength(int k) const {
    const size_t first = (size_t)k * mPartBytes;
    const size_t end = (size_t)(static_cast<unsigned char*>(mMapping) + mFileSize - mPixels);
    return first >= end ? 0 : std::min(mPartBytes, end - first);
}

bool SharedPixels::mapPart(unsigned char* base, int k, int fd, size_t offset, bool populate) const {
    const size_t length = partLength(k);
    if (length == 0) return true;
    return mmap(base + (size_t)k * mPartBytes, length, PROT_READ | PROT_WRITE,
                MAP_SHARED | MAP_FIXED | (populate ? MAP_POPULATE : 0), fd,
                (off_t)offset) != MAP_FAILED;
}

bool SharedPixels::movePart(unsigned char* base, int from, int to) const {
    // Only the picture's last part may be shorter than the one before it.
    const size_t length = partLength(from), moved = partLength(to);
    if (moved == 0) return true;
    if (length < moved) return false;
    return mremap(base + (size_t)from * mPartBytes, length, moved, MREMAP_MAYMOVE | MREMAP_FIXED,
                  base + (size_t)to * mPartBytes) != MAP_FAILED;
}

bool SharedPixels::useRing(size_t partBytes, int slots) {
    const size_t page = (size_t)sysconf(_SC_PAGESIZE);
    if (mPixels == nullptr || mRingFd >= 0 || partBytes == 0 || partBytes % page != 0 ||
        slots < 1) {
        return false;
    }
    mDriverPixels = findDriverPixels();
    if (mDriverPixels == nullptr) return false;
    int fd = memfd_create("kiv-graphic-buffer-ring", MFD_CLOEXEC);
    if (fd < 0 || ftruncate(fd, (off_t)(partBytes * slots)) != 0) {
        if (fd >= 0) close(fd);
        mDriverPixels = nullptr;
        return false;
    }
    mRingFd = fd;
    mPartBytes = partBytes;
    mSlots = slots;
    return true;
}

bool SharedPixels::takePart(int k) {
    if (mRingFd < 0 || k < 0) return false;
    const size_t pixelStart = (size_t)(mPixels - static_cast<unsigned char*>(mMapping));
    const size_t slot = (size_t)(k % mSlots) * mPartBytes;
    // Only the driver's mapping moves; the CPU uses it too (pixels()).
    // The slot's pages move on with their page tables: mapping them afresh
    // would drop and rebuild an entry for every page of every part (a good
    // part of a large picture's CPU time).
    const int before = k - mSlots;
    const bool moved = before >= 0 && movePart(mDriverPixels, before, k);
    bool ok = true;
    // The part before gets its own (never written) pages back: zeros.
    if (before >= 0)
        ok = mapPart(mDriverPixels, before, mFd, pixelStart + (size_t)before * mPartBytes, false);
    if (!moved) ok = mapPart(mDriverPixels, k, mRingFd, slot, true) && ok;
    return ok;
}

void SharedPixels::free() {
    if (mMapping != nullptr) munmap(mMapping, mFileSize);
    if (mFd >= 0) close(mFd);
    if (mRingFd >= 0) close(mRingFd);
    mRingFd = -1;
    mPartBytes = 0;
    mSlots = 0;
    mDriverPixels = nullptr;
    mFd = -1;
    mMapping = nullptr;
    mFileSize = 0;
    mPixels = nullptr;
    mWidth = mHeight = 0;
    mDiscarded = 0;
}

bool SharedPixels::mayImport() {
    return gImportAllowed.load() && gImportState.load() != IMPORT_FAILS;
}

void SharedPixels::allowImports(bool allowed) {
    gImportAllowed = allowed;
}

GLuint SharedPixels::importTexture(GLuint* memoryObject) const {
    *memoryObject = 0;
    if (gImportState.load() == IMPORT_UNKNOWN) {
        bool works = probe();
        gImportState = works ? IMPORT_WORKS : IMPORT_FAILS;
        if (!works) VF_LogMsg(VF_LOG_INFO, "HostGl: no shared texture memory; buffers are copied");
    }
    if (!mayImport()) return 0;
    return import(memoryObject);
}

GLuint SharedPixels::import(GLuint* memoryObject) const {
    const EglExtensions& ext = EglExtensions::get();
    if (empty() || !memoryObjectsPresent()) return 0;
    while (glGetError() != GL_NO_ERROR) {
    }
    int fd = fcntl(mFd, F_DUPFD_CLOEXEC, 0);
    if (fd < 0) return 0;
    GLuint memory = 0;
    ext.glCreateMemoryObjectsEXT(1, &memory);
    ext.glImportMemoryFdEXT(memory, mFileSize, GL_HANDLE_TYPE_OPAQUE_FD_EXT, fd);
    if (glGetError() != GL_NO_ERROR) {
        // A refused import leaves the descriptor with us.
        close(fd);
        ext.glDeleteMemoryObjectsEXT(1, &memory);
        return 0;
    }
    GLuint texture = 0;
    glGenTextures(1, &texture);
    glBindTexture(GL_TEXTURE_2D, texture);
    ext.glTexStorageMem2DEXT(GL_TEXTURE_2D, 1, GL_RGBA8_OES, (GLsizei)mWidth, (GLsizei)mHeight,
                             memory, 0);
    if (glGetError() != GL_NO_ERROR) {
        deleteImported(texture, memory);
        return 0;
    }
    *memoryObject = memory;
    return texture;
}

void SharedPixels::deleteImported(GLuint texture, GLuint memoryObject) {
    if (texture != 0) glDeleteTextures(1, &texture);
    if (memoryObject != 0 && memoryObjectsPresent()) {
        EglExtensions::get().glDeleteMemoryObjectsEXT(1, &memoryObject);
    }
}

}  // namespace android
