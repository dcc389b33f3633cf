#include "SharedPixels.h"

#include <fcntl.h>
#include <string.h>
#include <sys/mman.h>
#include <unistd.h>

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

}  // namespace

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
    return true;
}

void SharedPixels::free() {
    if (mMapping != nullptr) munmap(mMapping, mFileSize);
    if (mFd >= 0) close(mFd);
    mFd = -1;
    mMapping = nullptr;
    mFileSize = 0;
    mPixels = nullptr;
}

int SharedPixels::duplicateFd() const {
    return mFd >= 0 ? fcntl(mFd, F_DUPFD_CLOEXEC, 0) : -1;
}

SharedPixels::SharedPixels(SharedPixels&& other) noexcept {
    *this = static_cast<SharedPixels&&>(other);
}

SharedPixels& SharedPixels::operator=(SharedPixels&& other) noexcept {
    if (this != &other) {
        free();
        mFd = other.mFd;
        mMapping = other.mMapping;
        mFileSize = other.mFileSize;
        mPixels = other.mPixels;
        other.mFd = -1;
        other.mMapping = nullptr;
        other.mFileSize = 0;
        other.mPixels = nullptr;
    }
    return *this;
}

}  // namespace android
