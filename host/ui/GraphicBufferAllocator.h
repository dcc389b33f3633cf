// The host's buffer memory: new memory for a layout (a memory file the GPU
// can take as texture storage when the rows fall where the driver's do,
// plain memory otherwise), and a pool of a few buffers that went away after
// GPU use, whose memory and mirror go to the next buffer of the same layout
// and kind. Fresh memory costs a page fault per page and a new texture a
// fresh allocation in the driver: with 12-megapixel pictures that is tens of
// milliseconds a buffer, against at most clearing a recycled one.
#ifndef KIV_HOST_UI_GRAPHICBUFFERALLOCATOR_H
#define KIV_HOST_UI_GRAPHICBUFFERALLOCATOR_H

#include <stdint.h>

#include <memory>
#include <mutex>
#include <vector>

#include <ui/PixelFormat.h>
#include <utils/Errors.h>

#include "host/ui/BufferStorage.h"

namespace android {

class GraphicBufferAllocator {
public:
    static GraphicBufferAllocator& get();

    // Storage for a buffer, new or recycled: BAD_VALUE (logged) for a layout
    // the host cannot hold, NO_MEMORY.
    status_t allocate(uint32_t width, uint32_t height, PixelFormat format, uint32_t usage,
                      uint32_t stride, std::unique_ptr<BufferStorage>* out);
    // Takes back the storage of a buffer that went away.
    void free(std::unique_ptr<BufferStorage> storage);

private:
    GraphicBufferAllocator();
    std::unique_ptr<BufferStorage> take(uint32_t fourcc, uint32_t width, uint32_t height,
                                        uint32_t stride, bool render);
    // Frees everything kept (no lock held while freeing: that uses the host
    // context and may end it).
    static void drain();

    std::mutex mLock;
    std::vector<std::unique_ptr<BufferStorage>> mPool;  // the most recent last
    size_t mBytes = 0;
};

}  // namespace android

#endif
