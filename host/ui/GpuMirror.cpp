#include "host/ui/GpuMirror.h"

#include <string.h>

#include "host/graphics/HostGl.h"
#include "host/ui/BufferStorage.h"
#include "host/ui/GraphicBufferMapper.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_log.h"

namespace android {

namespace {

// The RGBA colour an all-zero CPU copy converts to.
bool zeroColour(uint32_t fourcc, unsigned char rgba[4]) {
    unsigned char zeros[2 * 2 * 4] = {};  // a 2x2 picture of any layout
    unsigned char out[2 * 2 * 4];
    PixelView in(zeros, 2, 2, fourcc), converted(out, 2, 2, VC_FORMAT_RGBA);
    if (VCImage_convert(&in, &converted) != 0) return false;
    memcpy(rgba, out, 4);
    return true;
}

// The texture's storage is the CPU copy: CPU writes are there at once (the
// mapper waits for the GPU before it lets the CPU write a sampled buffer).
class SharedMirror : public GpuMirror {
public:
    SharedMirror(GLuint texture, GLuint memoryObject)
        : GpuMirror(SHARED, texture, memoryObject, nullptr, 0) {}
    bool toGpu(const BufferStorage&) override { return true; }
    bool toCpu(BufferStorage&) override { return HostGl::get().waitForGpu(); }
};

// The texture has storage of its own in RGBA rows that the CPU reaches: each
// crossing is one CPU conversion (or copy), once the GPU is done with it.
class MappedMirror : public GpuMirror {
public:
    MappedMirror(GLuint texture, GLuint memoryObject, std::unique_ptr<SharedPixels> pixels)
        : GpuMirror(MAPPED, texture, memoryObject, std::move(pixels), 0) {}

    bool toGpu(const BufferStorage& s) override {
        if (!HostGl::get().waitForGpu()) return false;
        if (!s.zero)
            return GraphicBufferMapper::move(GraphicBufferMapper::rowsOf(s), rows(), mScratch);
        unsigned char colour[4];
        if (!zeroColour(s.fourcc, colour)) return false;
        unsigned char* p = mPixels->pixels();
        const size_t pixels = SharedPixels::rowPitch(mPixels->width()) / 4 * mPixels->height();
        for (size_t i = 0; i < pixels; ++i) memcpy(p + i * 4, colour, 4);
        return true;
    }
    bool toCpu(BufferStorage& s) override {
        return HostGl::get().waitForGpu() &&
               GraphicBufferMapper::move(rows(), GraphicBufferMapper::rowsOf(s), mScratch);
    }

private:
    PixelRows rows() const {
        return {mPixels->pixels(), VC_FORMAT_RGBA, (int)mPixels->width(), (int)mPixels->height(),
                (int)(SharedPixels::rowPitch(mPixels->width()) / 4)};
    }
};

// A plain texture: GL uploads and read-backs of compact RGBA in the host
// graphics context (the CPU copy itself when it is compact RGBA).
class TransferMirror : public GpuMirror {
public:
    TransferMirror(GLuint texture, size_t bytes)
        : GpuMirror(TRANSFER, texture, 0, nullptr, bytes) {}

    bool toGpu(const BufferStorage& s) override {
        const int w = (int)s.width, h = (int)s.height;
        unsigned char colour[4];
        const unsigned char* rgba = compactRgba(s);
        if (s.zero ? !zeroColour(s.fourcc, colour)
                   : rgba == nullptr && !GraphicBufferMapper::move(GraphicBufferMapper::rowsOf(s),
                                                                   rgbaRows(s), mScratch)) {
            return false;
        }
        if (rgba == nullptr) rgba = mScratch[2].data();
        return HostGl::get().run([&] {
            if (s.zero) return clear(colour);
            glBindTexture(GL_TEXTURE_2D, mTexture);
            glPixelStorei(GL_UNPACK_ALIGNMENT, 4);
            glTexSubImage2D(GL_TEXTURE_2D, 0, 0, 0, w, h, GL_RGBA, GL_UNSIGNED_BYTE, rgba);
            glBindTexture(GL_TEXTURE_2D, 0);
            return glGetError() == GL_NO_ERROR;
        });
    }

    bool toCpu(BufferStorage& s) override {
        const int w = (int)s.width, h = (int)s.height;
        unsigned char* rgba = compactRgba(s);
        if (rgba == nullptr) rgba = rgbaRows(s).data;
        bool ok = HostGl::get().run([&] {
            bool complete = attach();
            if (complete) {
                glPixelStorei(GL_PACK_ALIGNMENT, 4);
                glReadPixels(0, 0, w, h, GL_RGBA, GL_UNSIGNED_BYTE, rgba);
            }
            detach();
            return complete && glGetError() == GL_NO_ERROR;
        });
        if (!ok) VF_LogMsg(VF_LOG_ERROR, "GraphicBuffer: cannot read the GPU copy back");
        return ok && (rgba == s.data || GraphicBufferMapper::move(
                                            rgbaRows(s), GraphicBufferMapper::rowsOf(s), mScratch));
    }

private:
    static unsigned char* compactRgba(const BufferStorage& s) {
        return s.fourcc == VC_FORMAT_RGBA && s.stride == s.width ? s.data : nullptr;
    }
    PixelRows rgbaRows(const BufferStorage& s) {
        const int w = (int)s.width, h = (int)s.height;
        return {GraphicBufferMapper::scratch(mScratch[2], w, h, VC_FORMAT_RGBA), VC_FORMAT_RGBA, w,
                h, w};
    }
    bool attach() {
        glBindFramebuffer(GL_FRAMEBUFFER, HostGl::get().framebuffer_l());
        glFramebufferTexture2D(GL_FRAMEBUFFER, GL_COLOR_ATTACHMENT0, GL_TEXTURE_2D, mTexture, 0);
        return glCheckFramebufferStatus(GL_FRAMEBUFFER) == GL_FRAMEBUFFER_COMPLETE;
    }
    void detach() {
        glFramebufferTexture2D(GL_FRAMEBUFFER, GL_COLOR_ATTACHMENT0, GL_TEXTURE_2D, 0, 0);
        glBindFramebuffer(GL_FRAMEBUFFER, 0);
    }
    bool clear(const unsigned char colour[4]) {
        bool complete = attach();
        if (complete) {
            glClearColor(colour[0] / 255.0f, colour[1] / 255.0f, colour[2] / 255.0f,
                         colour[3] / 255.0f);
            glClear(GL_COLOR_BUFFER_BIT);
        }
        detach();
        return complete && glGetError() == GL_NO_ERROR;
    }
};

}  // namespace

GpuMirror::GpuMirror(Kind kind, GLuint texture, GLuint memoryObject,
                     std::unique_ptr<SharedPixels> pixels, size_t textureBytes)
    : mKind(kind),
      mTexture(texture),
      mMemoryObject(memoryObject),
      mPixels(std::move(pixels)),
      mTextureBytes(mPixels != nullptr ? mPixels->fileSize() : textureBytes) {}

GpuMirror::~GpuMirror() {
    // The GL objects go first: the import holds on to the storage until then.
    HostGl::get().run([this] {
        SharedPixels::deleteImported(mTexture, mMemoryObject);
        return true;
    });
    HostGl::get().release();
}

size_t GpuMirror::bytes() const {
    return mTextureBytes + mScratch[0].size() + mScratch[1].size() + mScratch[2].size();
}

std::unique_ptr<GpuMirror> GpuMirror::make(const BufferStorage& s) {
    HostGl& gl = HostGl::get();
    if (!gl.acquire()) return nullptr;
    std::unique_ptr<GpuMirror> mirror;
    bool ok = gl.run([&] {
        GLuint memory = 0;
        GLuint texture = s.file != nullptr ? s.file->importTexture(&memory) : 0;
        if (texture != 0) {
            mirror.reset(new SharedMirror(texture, memory));
        } else {
            std::unique_ptr<SharedPixels> pixels(new SharedPixels());
            if (SharedPixels::mayImport() && pixels->allocate(s.width, s.height)) {
                texture = pixels->importTexture(&memory);
            }
            if (texture != 0) {
                mirror.reset(new MappedMirror(texture, memory, std::move(pixels)));
            } else {
                glGenTextures(1, &texture);
                glBindTexture(GL_TEXTURE_2D, texture);
                glTexImage2D(GL_TEXTURE_2D, 0, GL_RGBA, (GLsizei)s.width, (GLsizei)s.height, 0,
                             GL_RGBA, GL_UNSIGNED_BYTE, nullptr);
                mirror.reset(new TransferMirror(texture, (size_t)s.width * s.height * 4));
            }
        }
        // Linear, clamped, level 0 only: the texture must be complete to
        // become an EGL image.
        glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MIN_FILTER, GL_LINEAR);
        glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MAG_FILTER, GL_LINEAR);
        glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_S, GL_CLAMP_TO_EDGE);
        glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_T, GL_CLAMP_TO_EDGE);
        glBindTexture(GL_TEXTURE_2D, 0);
        return glGetError() == GL_NO_ERROR;
    });
    if (mirror == nullptr) gl.release();  // otherwise the mirror lets its user go
    if (!ok) {
        VF_LogMsg(VF_LOG_ERROR, "GraphicBuffer: mirror texture %ux%u failed", s.width, s.height);
        mirror.reset();
    }
    return mirror;
}

}  // namespace android
