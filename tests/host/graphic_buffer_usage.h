// The GraphicBuffer usages the host buffer suites allocate with.
#ifndef KIV_TESTS_HOST_GRAPHIC_BUFFER_USAGE_H
#define KIV_TESTS_HOST_GRAPHIC_BUFFER_USAGE_H

#include <ui/GraphicBuffer.h>

#include <stdint.h>

namespace {

const uint32_t kRead = android::GraphicBuffer::USAGE_SW_READ_OFTEN;
const uint32_t kWrite = android::GraphicBuffer::USAGE_SW_WRITE_OFTEN;
const uint32_t kTextureUsage = android::GraphicBuffer::USAGE_HW_TEXTURE | kRead | kWrite;
const uint32_t kRenderUsage = kTextureUsage | android::GraphicBuffer::USAGE_HW_RENDER;

}  // namespace

#endif
