#include "core/egl/EglImage.h"

#include <string.h>

#include <GLES2/gl2ext.h>
#include <ui/GraphicBuffer.h>

#include "core/egl/EglCheck.h"
#include "core/egl/EglExtensions.h"
#include "core/egl/EglNativeSeam.h"
#include "core/egl/HalPixelFormat.h"
#include "core/egl/Platform.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_geometry.h"
#include "vccore/vc_error.h"
#include "vccore/vc_log.h"

#define VC_SOURCE "core/egl/EglImage"

using android::GraphicBuffer;
using android::sp;

namespace {

// The pixels of a locked buffer, handed out for as long as the lock lasts:
// destroying the record gives the buffer back.
class LockedImage : public VCImage {
public:
    LockedImage(const sp<GraphicBuffer>& buffer, VCImage* locked) : mBuffer(buffer) {
        data = locked->data;
        width = locked->width;
        height = locked->height;
        format = locked->format;
        wrapped = locked->wrapped;
        size = locked->size;
        uvOffset = locked->uvOffset;
        locked->data = nullptr;  // a compact copy, if one was made, is ours now
        VCImage_destroy(locked);
    }
    ~LockedImage() override { mBuffer->unlock(); }

private:
    sp<GraphicBuffer> mBuffer;
};

}  // namespace

class EglImage::Kind {
public:
    virtual ~Kind() = default;
    virtual int initialize(EglImage& image) const = 0;
    // What bindTexture() binds; 0 for a kind with nothing to sample.
    virtual GLenum textureTarget(const EglImage& image) const = 0;
    virtual int write(EglImage& image, const VCImage& pixels, int sampleType) const = 0;
    virtual VCImage* read(EglImage& image) const = 0;
    // After the framebuffer's own flush, whatever else brings the rendering home.
    virtual int flush(EglImage&) const { return 0; }
};

// GL's own RGBA texture, filled by uploads; type 1 has a framebuffer around it.
class EglImage::TextureKind : public EglImage::Kind {
public:
    int initialize(EglImage& i) const override {
        // Named as the checked statements print them.
        GLuint &mTexture = i.mTexture, &mFrameBuffer = i.mFrameBuffer;
        const int mWidth = i.mWidth, mHeight = i.mHeight;
        if (!GL_CHECK(glGenTextures(1, &mTexture))) return VC_REPORT(VC_ERROR_UNKNOWN);
        if (i.mType != IMAGE_FRAMEBUFFER) return 0;
        bool ok = GL_CHECK(glGenFramebuffers(1, &mFrameBuffer)) &&
                  GL_CHECK(glBindTexture(GL_TEXTURE_2D, mTexture)) &&
                  GL_CHECK(glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MIN_FILTER, GL_LINEAR)) &&
                  GL_CHECK(glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MAG_FILTER, GL_LINEAR)) &&
                  GL_CHECK(glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_S, GL_CLAMP_TO_EDGE)) &&
                  GL_CHECK(glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_T, GL_CLAMP_TO_EDGE)) &&
                  GL_CHECK(glTexImage2D(GL_TEXTURE_2D, 0, GL_RGBA, mWidth, mHeight, 0, GL_RGBA,
                                        GL_UNSIGNED_BYTE, NULL)) &&
                  GL_CHECK(glBindFramebuffer(GL_FRAMEBUFFER, mFrameBuffer)) &&
                  GL_CHECK(glFramebufferTexture2D(GL_FRAMEBUFFER, GL_COLOR_ATTACHMENT0,
                                                  GL_TEXTURE_2D, mTexture, 0));
        bool complete = ok && glCheckFramebufferStatus(GL_FRAMEBUFFER) == GL_FRAMEBUFFER_COMPLETE;
        glBindFramebuffer(GL_FRAMEBUFFER, 0);
        glBindTexture(GL_TEXTURE_2D, 0);
        if (complete) return 0;
        glDeleteTextures(1, &mTexture);
        glDeleteFramebuffers(1, &mFrameBuffer);
        mTexture = 0;
        mFrameBuffer = 0;
        // A failed call is a GL error like any other; only a framebuffer that
        // GL calls incomplete is a state error.
        return VC_REPORT(ok ? VC_ERROR_INVALID_STATE : VC_ERROR_UNKNOWN);
    }

    GLenum textureTarget(const EglImage&) const override { return GL_TEXTURE_2D; }

    int write(EglImage& i, const VCImage& image, int sampleType) const override {
        if (image.data == nullptr) return VC_REPORT(VC_ERROR_NULL_PARAM);
        // GL takes width x height RGBA bytes whatever the record's format
        // says; a record holding fewer would be read past its end.
        if (image.width > 0 && image.height > 0 &&
            (uint64_t)VCImage_size(&image) < (uint64_t)image.width * (uint64_t)image.height * 4) {
            return VC_REPORT(VC_ERROR_INVALID_PARAM);
        }
        bool ok = i.bindForUpload(sampleType) &&
                  GL_CHECK(glTexImage2D(GL_TEXTURE_2D, 0, GL_RGBA, image.width, image.height, 0,
                                        GL_RGBA, GL_UNSIGNED_BYTE, image.data));
        return ok ? 0 : VC_REPORT(VC_ERROR_UNKNOWN);
    }

    VCImage* read(EglImage& i) const override {
        if (i.mType != IMAGE_FRAMEBUFFER) return nullptr;
        const int mWidth = i.mWidth, mHeight = i.mHeight;
        const GLuint mFrameBuffer = i.mFrameBuffer;
        VCImage* wrap = VCImage_createNew(mWidth, mHeight, VC_FORMAT_RGBA);
        if (wrap == nullptr) {
            VC_REPORT(VC_ERROR_ALLOC_FAILED);
            return nullptr;
        }
        bool ok = GL_CHECK(glBindFramebuffer(GL_FRAMEBUFFER, mFrameBuffer)) &&
                  GL_CHECK(glReadPixels(0, 0, mWidth, mHeight, GL_RGBA, GL_UNSIGNED_BYTE,
                                        (GLvoid*)(wrap->data)));
        i.unbindFrameBuffer();
        if (ok) return wrap;
        VCImage_destroy(wrap);
        VC_REPORT(VC_ERROR_UNKNOWN);
        return nullptr;
    }
};

// A GraphicBuffer imported through an EGLImageKHR: sampled as an external
// texture (type 2) or rendered into through a renderbuffer (type 3). The CPU
// reaches the pixels by locking the buffer.
class EglImage::BufferKind : public EglImage::Kind {
public:
    int initialize(EglImage& i) const override {
        uint32_t format = i.mType == IMAGE_EXTERNAL_FRAMEBUFFER ? VC_FORMAT_RGBA : i.mFormat;
        int pixelFormat = HalPixelFormat::codeOf(format);
        if (pixelFormat == 0) {
            EglLog(VF_LOG_ERROR,
                   VCImage_isYUV(format) ? "Unsupported format for the EgImage: %4.4s"
                                         : "Unsupported format for the EglImage: %4.4s",
                   (const char*)&format);
            return VC_REPORT(VC_ERROR_UNSUPPORTED);
        }
        if (i.mEglEnv == nullptr) {
            EglLog(VF_LOG_ERROR, "EGL: an EglImage on a GraphicBuffer needs an EglEnvironment");
            return VC_REPORT(VC_ERROR_INVALID_STATE);
        }
        // Sampling the CPU writes, rendering the GPU writes the CPU reads back.
        uint32_t usage = GraphicBuffer::USAGE_SW_READ_OFTEN | GraphicBuffer::USAGE_SW_WRITE_OFTEN |
                         GraphicBuffer::USAGE_HW_TEXTURE;
        if (i.mType == IMAGE_EXTERNAL_FRAMEBUFFER) usage |= GraphicBuffer::USAGE_HW_RENDER;
        EglLog(VF_LOG_DEBUG,
               "EglImage: Creating GraphicBuffer %dx%d %4.4s (format %d, usage 0x%08x)", i.mWidth,
               i.mHeight, (const char*)&format, pixelFormat, usage);
        i.mGraphicBuffer = new GraphicBuffer((uint32_t)i.mWidth, (uint32_t)i.mHeight, pixelFormat,
                                             usage, "EglImage");
        android::status_t status = i.mGraphicBuffer->initCheck();
        if (status != android::NO_ERROR) {
            EglLog(VF_LOG_ERROR, "Failed to initialize GraphicBuffer. Error: %s.",
                   strerror(-status));
            i.mGraphicBuffer.clear();
            return VC_REPORT(VC_ERROR_ALLOC_FAILED);
        }
        EGLDisplay display = i.mEglEnv->getEGLDisplay();
        i.mEglImage = EglNativeSeam::get().createNativeBufferImage(display, i.mGraphicBuffer.get());
        if (i.mEglImage == EGL_NO_IMAGE_KHR) {
            EGLint error = eglGetError();
            EglLog(VF_LOG_ERROR, "Error: eglCreateImage() failed at %s:%i\n", VC_SOURCE, __LINE__);
            EglLog(VF_LOG_ERROR, "Error: eglGetError() = %i (0x%04X) at %s:%i\n", error, error,
                   VC_SOURCE, __LINE__);
            i.mGraphicBuffer.clear();
            return VC_REPORT(VC_ERROR_UNKNOWN);
        }
        if (!(i.mType == IMAGE_EXTERNAL ? attachTexture(i) : attachRenderbuffer(i))) {
            // Leave nothing behind (the owner may never call release()), but
            // the environment, for another try.
            sp<EglEnvironment> env = i.mEglEnv;
            i.release_l();
            i.mEglEnv = env;
            return VC_REPORT(VC_ERROR_UNKNOWN);
        }
        EglLog(VF_LOG_DEBUG, "Successfully created texture for input: %dx%d %4.4s", i.mWidth,
               i.mHeight, (const char*)&format);
        i.mFormat = format;
        return 0;
    }

    GLenum textureTarget(const EglImage& i) const override {
        return i.mType == IMAGE_EXTERNAL ? GL_TEXTURE_EXTERNAL_OES : 0;
    }

    int write(EglImage& i, const VCImage& image, int) const override {
        if (image.data == nullptr) return VC_REPORT(VC_ERROR_NULL_PARAM);
        if (i.mGraphicBuffer == nullptr) {
            EglLog(VF_LOG_ERROR, "EGL: Graphic buffer is NULL");
            return VC_REPORT(VC_ERROR_INVALID_STATE);
        }
        // A wrapping lock: the writes must land in the buffer itself.
        VCImage* target = Platform::lockGraphicBuffer(i.mGraphicBuffer, Platform::LOCK_WRAP,
                                                      HalPixelFormat::codeOf(i.mFormat));
        if (target == nullptr) {
            EglLog(VF_LOG_ERROR, "EGL: Failed to lock the graphic buffer");
            return VC_REPORT(VC_ERROR_UNKNOWN);
        }
        int result = writeLocked(i, image, *target);
        VCImage_destroy(target);
        if (i.mGraphicBuffer->unlock() != android::NO_ERROR) {
            EglLog(VF_LOG_ERROR,
                   "Failed to release the GraphicBuffer's pixels. Did you really lock them "
                   "before?");
            return VC_REPORT(VC_ERROR_UNKNOWN);
        }
        return result;
    }

    VCImage* read(EglImage& i) const override {
        if (i.mGraphicBuffer == nullptr) {
            EglLog(VF_LOG_ERROR, "EGL: Graphic buffer is NULL");
            return nullptr;
        }
        // A read lock: writes into the record never reach the GPU.
        VCImage* locked = Platform::lockGraphicBuffer(i.mGraphicBuffer, Platform::LOCK_COMPACT,
                                                      Platform::kImplementationDefinedFormat,
                                                      GraphicBuffer::USAGE_SW_READ_OFTEN);
        if (locked == nullptr) {
            EglLog(VF_LOG_ERROR, "EGL: Failed to lock the graphic buffer");
            return nullptr;
        }
        VCImage* image = new LockedImage(i.mGraphicBuffer, locked);
        const unsigned char* chroma = nullptr;
        if (VCImage_isYUV420(image->format) && image->data != nullptr) {
            chroma =
                image->data +
                (image->uvOffset != 0 ? image->uvOffset : (uint32_t)(image->width * image->height));
        }
        EglLog(VF_LOG_DEBUG, "EGL: GraphicBuffer at: %dx%d Y:%p UV:%p", image->width, image->height,
               (const void*)image->data, (const void*)chroma);
        return image;
    }

    int flush(EglImage& i) const override {
        if (i.mGraphicBuffer == nullptr) {
            EglLog(VF_LOG_ERROR, "EGL: Graphic buffer is NULL");
            return VC_ERROR_INVALID_STATE;
        }
        // A read lock brings the GPU's rendering into the CPU's view.
        void* pixels = nullptr;
        if (i.mGraphicBuffer->lock(GraphicBuffer::USAGE_SW_READ_OFTEN, &pixels) !=
            android::NO_ERROR) {
            EglLog(VF_LOG_ERROR, "EGL: Failed to lock the graphic buffer");
            return VC_REPORT(VC_ERROR_UNKNOWN);
        }
        i.mGraphicBuffer->unlock();
        return 0;
    }

private:
    static bool attachTexture(EglImage& i) {
        const auto glEGLImageTargetTexture2DOES = EglExtensions::get().glEGLImageTargetTexture2DOES;
        const EGLImageKHR mEglImage = i.mEglImage;
        GLuint& mTexture = i.mTexture;
        bool ok =
            GL_CHECK(glGenTextures(1, &mTexture)) &&
            GL_CHECK(glBindTexture(GL_TEXTURE_EXTERNAL_OES, mTexture)) &&
            GL_CHECK(glTexParameterf(GL_TEXTURE_EXTERNAL_OES, GL_TEXTURE_MIN_FILTER, GL_LINEAR)) &&
            GL_CHECK(glTexParameterf(GL_TEXTURE_EXTERNAL_OES, GL_TEXTURE_MAG_FILTER, GL_LINEAR)) &&
            GL_CHECK(
                glTexParameteri(GL_TEXTURE_EXTERNAL_OES, GL_TEXTURE_WRAP_S, GL_CLAMP_TO_EDGE)) &&
            GL_CHECK(
                glTexParameteri(GL_TEXTURE_EXTERNAL_OES, GL_TEXTURE_WRAP_T, GL_CLAMP_TO_EDGE)) &&
            // clang-format off
            GL_CHECK(glEGLImageTargetTexture2DOES(GL_TEXTURE_EXTERNAL_OES, (GLeglImageOES) mEglImage));
        // clang-format on
        glBindTexture(GL_TEXTURE_EXTERNAL_OES, 0);
        return ok;
    }

    static bool attachRenderbuffer(EglImage& i) {
        const auto glEGLImageTargetRenderbufferStorageOES =
            EglExtensions::get().glEGLImageTargetRenderbufferStorageOES;
        const EGLImageKHR mEglImage = i.mEglImage;
        GLuint &mRenderBuffer = i.mRenderBuffer, &mFrameBuffer = i.mFrameBuffer;
        bool ok = GL_CHECK(glGenRenderbuffers(1, &mRenderBuffer)) &&
                  GL_CHECK(glBindRenderbuffer(GL_RENDERBUFFER, mRenderBuffer)) &&
                  GL_CHECK(glEGLImageTargetRenderbufferStorageOES(GL_RENDERBUFFER,
                                                                  (GLeglImageOES)(mEglImage))) &&
                  GL_CHECK(glGenFramebuffers(1, &mFrameBuffer)) &&
                  GL_CHECK(glBindFramebuffer(GL_FRAMEBUFFER, mFrameBuffer)) &&
                  GL_CHECK(glFramebufferRenderbuffer(GL_FRAMEBUFFER, GL_COLOR_ATTACHMENT0,
                                                     GL_RENDERBUFFER, mRenderBuffer));
        if (ok && glCheckFramebufferStatus(GL_FRAMEBUFFER) != GL_FRAMEBUFFER_COMPLETE) {
            EglLog(VF_LOG_ERROR, "EGL: GraphicBuffer framebuffer %dx%d is incomplete", i.mWidth,
                   i.mHeight);
            ok = false;
        }
        glBindFramebuffer(GL_FRAMEBUFFER, 0);
        glBindRenderbuffer(GL_RENDERBUFFER, 0);
        return ok;
    }

    static int writeLocked(EglImage& i, const VCImage& image, VCImage& target) {
        const bool sameSize = image.width == target.width && image.height == target.height;
        if (!sameSize && !(VCImage_isYUV(image.format) && VCImage_isYUV(target.format))) {
            EglLog(VF_LOG_ERROR, "Incompatible image : %dx%d '%4.4s' --> %dx%d '%4.4s'",
                   image.width, image.height, (const char*)&image.format, target.width,
                   target.height, (const char*)&target.format);
            return VC_REPORT(VC_ERROR_INVALID_PARAM);
        }
        if (sameSize) {
            // Straight into the buffer, converted on the way when the formats differ.
            int result = VCImage_convert(&image, &target);
            if (result == 0 || image.format == target.format) {
                return result == 0 ? 0 : VC_REPORT(VC_ERROR_UNKNOWN);
            }
            EglLog(VF_LOG_ERROR, "EGL: image.convert returned %d", result);
            return result;
        }
        // Resized from a compact picture in the buffer's format.
        VCImage* converted = VCImage_createNew(image.width, image.height, target.format);
        if (converted == nullptr) {
            EglLog(VF_LOG_ERROR, "EGL: Cannot create VCImage_createNew");
            return VC_REPORT(VC_ERROR_ALLOC_FAILED);
        }
        int result = VCImage_convert(&image, converted);
        if (result != 0) {
            EglLog(VF_LOG_ERROR, "EGL: image.convert returned %d", result);
        } else {
            i.doTransformResizeYUV(target.data, target.width, target.height, converted->data,
                                   converted->width, converted->height);
        }
        VCImage_destroy(converted);
        return result;
    }
};

const EglImage::Kind& EglImage::kind() const {
    static const TextureKind texture;
    static const BufferKind buffer;
    if (mType == IMAGE_TEXTURE || mType == IMAGE_FRAMEBUFFER) return texture;
    return buffer;
}

EglImage::EglImage(IMAGE_TYPE type, int width, int height)
    : EglImage(nullptr, type, width, height, 0) {}

EglImage::EglImage(const android::sp<EglEnvironment>& env, IMAGE_TYPE type, int width, int height)
    : EglImage(env, type, width, height, 0) {}

EglImage::EglImage(const android::sp<EglEnvironment>& env, IMAGE_TYPE type, int width, int height,
                   int format)
    : EglObject(width, height),
      mType(type),
      mFormat((uint32_t)format),
      mEglEnv(env),
      mTexture(0),
      mFrameBuffer(0),
      mRenderBuffer(0),
      mEglImage(EGL_NO_IMAGE_KHR),
      mInitialized(false) {}

EglImage::~EglImage() {}

int EglImage::onDrawFrame() {
    return 0;
}

int EglImage::initialize_l() {
    if (mInitialized) return 0;
    if (mType < IMAGE_TEXTURE || mType > IMAGE_EXTERNAL_FRAMEBUFFER) {
        return VC_REPORT(VC_ERROR_UNSUPPORTED);
    }
    int result = kind().initialize(*this);
    mInitialized = result == 0;
    return result;
}

void EglImage::release_l() {
    if (mTexture != 0) {
        GL_CHECK(glDeleteTextures(1, &mTexture));
        mTexture = 0;
    }
    if (mFrameBuffer != 0) {
        GL_CHECK(glBindFramebuffer(GL_FRAMEBUFFER, 0));
        GL_CHECK(glDeleteFramebuffers(1, &mFrameBuffer));
        mFrameBuffer = 0;
    }
    if (mRenderBuffer != 0) {
        GL_CHECK(glDeleteRenderbuffers(1, &mRenderBuffer));
        mRenderBuffer = 0;
    }
    if (mEglImage != EGL_NO_IMAGE_KHR && mEglEnv != nullptr) {
        // Native buffers go through the seam; the checked text stays the EGL call's.
        auto eglDestroyImageKHR = [](EGLDisplay display, EGLImageKHR image) {
            return EglNativeSeam::get().destroyImage(display, image);
        };
        EGL_CHECK_BOOL(eglDestroyImageKHR(mEglEnv->getEGLDisplay(), mEglImage));
    }
    mEglImage = EGL_NO_IMAGE_KHR;
    mGraphicBuffer.clear();
    mEglEnv.clear();
    mInitialized = false;
}

int EglImage::bindTexture() {
    return bindTextureName(mTexture, "EGL: bindTexture mInitialized == false");
}

int EglImage::unbindTexture() {
    return bindTextureName(0, "EGL: not initialized");
}

int EglImage::bindTextureName(GLuint name, const char* notInitialized) {
    if (!mInitialized) {
        EglLog(VF_LOG_ERROR, "%s", notInitialized);
        return VC_ERROR_INVALID_STATE;
    }
    GLenum target = kind().textureTarget(*this);
    if (target == 0) return VC_REPORT(VC_ERROR_UNSUPPORTED);
    return GL_CHECK(glBindTexture(target, name)) ? 0 : VC_ERROR_UNKNOWN;
}

int EglImage::bindFrameBuffer() {
    if (!mInitialized) {
        EglLog(VF_LOG_ERROR, "EGL: bindFrameBuffer mInitialized == false");
        return VC_ERROR_INVALID_STATE;
    }
    // Types without a framebuffer would draw into the window instead.
    if (mFrameBuffer == 0) return VC_REPORT(VC_ERROR_UNSUPPORTED);
    if (!GL_CHECK(glBindFramebuffer(GL_FRAMEBUFFER, mFrameBuffer))) return VC_ERROR_UNKNOWN;
    if (glCheckFramebufferStatus(GL_FRAMEBUFFER) != GL_FRAMEBUFFER_COMPLETE) {
        return VC_REPORT(VC_ERROR_INVALID_STATE);
    }
    return 0;
}

int EglImage::unbindFrameBuffer() {
    if (!GL_CHECK(glBindFramebuffer(GL_FRAMEBUFFER, 0))) return VC_ERROR_UNKNOWN;
    return 0;
}

bool EglImage::bindForUpload(int sampleType) {
    return GL_CHECK(glBindTexture(GL_TEXTURE_2D, mTexture)) &&
           GL_CHECK(glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MIN_FILTER, GL_LINEAR)) &&
           GL_CHECK(glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MAG_FILTER, GL_LINEAR)) &&
           GL_CHECK(glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_S, sampleType)) &&
           GL_CHECK(glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_T, sampleType));
}

int EglImage::setImageData(const unsigned char* data, int sampleType) {
    if (!mInitialized || kind().textureTarget(*this) != GL_TEXTURE_2D) {
        EglLog(VF_LOG_ERROR, "EGL: not initialized");
        return VC_ERROR_INVALID_STATE;
    }
    if (data == nullptr) return VC_REPORT(VC_ERROR_NULL_PARAM);
    bool ok = bindForUpload(sampleType) &&
              GL_CHECK(glTexImage2D(GL_TEXTURE_2D, 0, GL_RGBA, mWidth, mHeight, 0, GL_RGBA,
                                    GL_UNSIGNED_BYTE, data));
    return ok ? 0 : VC_REPORT(VC_ERROR_UNKNOWN);
}

int EglImage::setImageData(const VCImage& image, int sampleType) {
    if (!mInitialized) {
        EglLog(VF_LOG_ERROR, "EGL: not initialized");
        return VC_ERROR_INVALID_STATE;
    }
    return kind().write(*this, image, sampleType);
}

VCImage* EglImage::getImageData() {
    if (!mInitialized) {
        EglLog(VF_LOG_ERROR, "EGL: not initialized");
        return nullptr;
    }
    return kind().read(*this);
}

int EglImage::flushCache() {
    if (!mInitialized) {
        EglLog(VF_LOG_ERROR, "EGL: not initialized");
        return VC_ERROR_INVALID_STATE;
    }
    if (mFrameBuffer != 0) {
        // Ends with the default framebuffer bound: a caller that draws into
        // this one afterwards binds it again.
        GLubyte texel[4];
        bool ok = GL_CHECK(glBindFramebuffer(GL_FRAMEBUFFER, mFrameBuffer)) &&
                  GL_CHECK(glReadPixels(0, 0, 1, 1, GL_RGBA, GL_UNSIGNED_BYTE, &texel));
        unbindFrameBuffer();
        if (!ok) return VC_REPORT(VC_ERROR_UNKNOWN);
    }
    return kind().flush(*this);
}

void EglImage::doTransformResizeYUV(unsigned char* dst, int dstWidth, int dstHeight,
                                    unsigned char* src, int srcWidth, int srcHeight) {
    EglLog(VF_LOG_DEBUG, "doTransformResizeYUV E");
    if (dst != nullptr && src != nullptr && dstWidth > 1 && dstHeight > 1 && srcWidth > 1 &&
        srcHeight > 1) {
        size_t dstLuma = (size_t)dstWidth * dstHeight;
        size_t srcLuma = (size_t)srcWidth * srcHeight;
        VCImage_scalePlane(src, srcWidth, srcHeight, dst, dstWidth, dstHeight, 1);
        const int cw = dstWidth / 2, ch = dstHeight / 2, scw = srcWidth / 2, sch = srcHeight / 2;
        if (mFormat == VC_FORMAT_YV12) {
            VCImage_scalePlane(src + srcLuma, scw, sch, dst + dstLuma, cw, ch, 1);
            VCImage_scalePlane(src + srcLuma + srcLuma / 4, scw, sch, dst + dstLuma + dstLuma / 4,
                               cw, ch, 1);
        } else {
            // Interleaved chroma: each pair moves as one two-byte sample.
            VCImage_scalePlane(src + srcLuma, scw, sch, dst + dstLuma, cw, ch, 2);
        }
    }
    EglLog(VF_LOG_DEBUG, "doTransformResizeYUV X");
}
