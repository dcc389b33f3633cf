// The GraphicBuffer usages the host buffer suites allocate with, and CPU
// access that locks, copies and unlocks in one call.
#ifndef KIV_TESTS_HOST_GRAPHIC_BUFFER_USAGE_H
#define KIV_TESTS_HOST_GRAPHIC_BUFFER_USAGE_H

#include <ui/GraphicBuffer.h>

#include <stdint.h>
#include <string.h>

#include <vector>

namespace {

const uint32_t kRead = android::GraphicBuffer::USAGE_SW_READ_OFTEN;
const uint32_t kWrite = android::GraphicBuffer::USAGE_SW_WRITE_OFTEN;
const uint32_t kTextureUsage = android::GraphicBuffer::USAGE_HW_TEXTURE | kRead | kWrite;
const uint32_t kRenderUsage = kTextureUsage | android::GraphicBuffer::USAGE_HW_RENDER;

// The first n bytes of the CPU pixels (empty when the lock fails); `where`
// receives their address.
inline std::vector<uint8_t> cpuBytes(const android::sp<android::GraphicBuffer>& buffer, size_t n,
                                     const void** where = nullptr) {
    void* pixels = nullptr;
    if (buffer->lock(kRead, &pixels) != android::NO_ERROR) return {};
    const uint8_t* p = static_cast<const uint8_t*>(pixels);
    std::vector<uint8_t> bytes(p, p + n);
    if (where != nullptr) *where = pixels;
    return buffer->unlock() == android::NO_ERROR ? bytes : std::vector<uint8_t>();
}

// Sets the first n bytes of the CPU pixels; their address, null when the
// lock fails.
inline void* fillCpu(const android::sp<android::GraphicBuffer>& buffer, uint8_t value, size_t n) {
    void* pixels = nullptr;
    if (buffer->lock(kWrite, &pixels) != android::NO_ERROR) return nullptr;
    memset(pixels, value, n);
    return buffer->unlock() == android::NO_ERROR ? pixels : nullptr;
}

}  // namespace

#endif
