// The GPU side of a host GraphicBuffer: an RGBA texture of the host graphics
// context, which EGL images over the buffer are made from, kept in step with
// the CPU copy by one of three strategies, chosen once when the buffer first
// meets the GPU and kept with its memory when that is recycled:
//  - SHARED: the texture's storage is the CPU copy itself (RGBA memory files
//    whose rows fall where llvmpipe's do), so nothing is ever copied;
//  - MAPPED: the texture has storage of its own that the CPU reaches (other
//    layouts), so a crossing is one CPU conversion or copy;
//  - TRANSFER: a plain texture, crossed with GL uploads and read-backs, for
//    drivers that cannot import memory.
#ifndef KIV_HOST_UI_GPUMIRROR_H
#define KIV_HOST_UI_GPUMIRROR_H

#include <memory>
#include <vector>

#include <GLES2/gl2.h>

#include "host/graphics/SharedPixels.h"

namespace android {

struct BufferStorage;

class GpuMirror {
public:
    enum Kind { SHARED, MAPPED, TRANSFER };

    // A mirror for `storage` with the first strategy the driver allows; it
    // holds a user of the host graphics context until deleted. Null on
    // failure (logged).
    static std::unique_ptr<GpuMirror> make(const BufferStorage& storage);
    virtual ~GpuMirror();

    Kind kind() const { return mKind; }
    GLuint texture() const { return mTexture; }
    // Memory held beyond the CPU copy: the texture's storage and scratch.
    size_t bytes() const;

    // CPU writes reach the mirror (an all-zero CPU copy as the colour zeros
    // convert to); GPU rendering into the mirror reaches the CPU copy. Both
    // wait for the GPU where one storage is shared. False on failure.
    virtual bool toGpu(const BufferStorage& storage) = 0;
    virtual bool toCpu(BufferStorage& storage) = 0;

    GpuMirror(const GpuMirror&) = delete;
    GpuMirror& operator=(const GpuMirror&) = delete;

protected:
    // `textureBytes`: what a texture of the driver's own storage takes.
    GpuMirror(Kind kind, GLuint texture, GLuint memoryObject, std::unique_ptr<SharedPixels> pixels,
              size_t textureBytes);

    const Kind mKind;
    const GLuint mTexture;
    const GLuint mMemoryObject;                   // the import of the texture's storage, if any
    const std::unique_ptr<SharedPixels> mPixels;  // the texture's own storage (MAPPED)
    const size_t mTextureBytes;
    // Compact pictures between layouts (and, for GL transfers, the RGBA that
    // GL takes), kept: fresh memory of this size costs a page fault per page,
    // and a buffer crosses many times.
    std::vector<unsigned char> mScratch[3];
};

}  // namespace android

#endif
