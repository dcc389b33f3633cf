// CPU locks of host buffers: one at a time, with a software usage, over the
// image core's plane layout. The two points where the CPU copy and the GPU
// mirror meet are here:
//  - a lock, like any GPU use through an image, first waits for a window
//    surface's draw into the buffer that may still be in flight (its swap
//    queued the buffer with a fence, as a device's does);
//  - a lock of a render target whose mirror the GPU may have drawn into
//    (an EGL image is alive, or was since the last lock) brings the drawing
//    to the CPU copy first. A lock on a thread with a current context fences
//    that context first; any other thread relies on the renderer having
//    flushed (glFlush, glFinish or a swap), as on a device;
//  - the unlock of a write sends the CPU copy to the mirror, once the GPU
//    uses the buffer (before that, its first use does), unless the copy is
//    exactly what a read-back just left there.
#ifndef KIV_HOST_UI_GRAPHICBUFFERMAPPER_H
#define KIV_HOST_UI_GRAPHICBUFFERMAPPER_H

#include <stdint.h>

#include <system/window.h>
#include <utils/Errors.h>

#include "host/ui/BufferStorage.h"

namespace android {

// An image-core record over pixels it does not own.
struct PixelView : VCImage {
    PixelView(unsigned char* pixels, int w, int h, uint32_t fourcc) {
        data = pixels;
        width = w;
        height = h;
        format = fourcc;
        wrapped = 1;
    }
};

// Pixels in memory: rows `rowPixels` pixels apart, the first `width` of each
// the picture's.
struct PixelRows {
    unsigned char* data;
    uint32_t fourcc;
    int width;
    int height;
    int rowPixels;
};

class GraphicBufferMapper {
public:
    static PixelRows rowsOf(const BufferStorage& storage) {
        return {storage.data, storage.fourcc, (int)storage.width, (int)storage.height,
                (int)storage.stride};
    }
    // Moves a picture between two layouts and formats of the same size:
    // the image core crops the compact picture out of wider rows, converts
    // it, and pastes it into wider rows. scratch[0] and scratch[1] hold the
    // compact pictures in between.
    static bool move(const PixelRows& from, const PixelRows& to,
                     std::vector<unsigned char>* scratch);
    // At least a compact width x height picture of `fourcc` in `memory`.
    static unsigned char* scratch(std::vector<unsigned char>& memory, int width, int height,
                                  uint32_t fourcc);

    static status_t lock(BufferStorage& storage, uint32_t usage, void** vaddr);
    // Waits for a swap's draw still in flight into the buffer, then lets its
    // fence go. False when the fence could not be waited for.
    static bool waitForWrite_l(BufferStorage& storage);
    // BAD_VALUE for a layout without chroma planes.
    static status_t lockYCbCr(BufferStorage& storage, uint32_t usage, android_ycbcr* ycbcr);
    // INVALID_OPERATION when not locked.
    static status_t unlock(BufferStorage& storage);

private:
    static status_t lock_l(BufferStorage& storage, uint32_t usage);
};

}  // namespace android

#endif
