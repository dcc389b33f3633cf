#include "core/egl/EglImage.h"

#include <string.h>

#include <GLES2/gl2ext.h>
#include <ui/GraphicBuffer.h>

#include "core/egl/EglCheck.h"
#include "core/egl/EglExtensions.h"
#include "core/egl/HalPixelFormat.h"
#include "core/egl/EglNativeSeam.h"
#include "core/egl/Platform.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_error.h"
#include "vccore/vc_log.h"

#define VC_SOURCE "core/egl/EglImage"

using android::GraphicBuffer;

namespace {

// Sampling the CPU writes, rendering the GPU writes the CPU reads back.
uint32_t usageOf(EglImage::IMAGE_TYPE type) {
    uint32_t software = GraphicBuffer::USAGE_SW_READ_OFTEN | GraphicBuffer::USAGE_SW_WRITE_OFTEN;
    if (type == EglImage::IMAGE_EXTERNAL_FRAMEBUFFER) {
        return software | GraphicBuffer::USAGE_HW_RENDER | GraphicBuffer::USAGE_HW_TEXTURE;
    }
    return software | GraphicBuffer::USAGE_HW_TEXTURE;
}

// Nearest source index for a destination index: the sample under the
// destination pixel's centre.
inline int nearest(int d, int dstSize, int srcSize) {
    int s = (int)(((int64_t)(2 * d + 1) * srcSize) / (2 * (int64_t)dstSize));
    return s < srcSize ? s : srcSize - 1;
}

// Resizes one plane of `step`-byte samples.
void resizePlane(unsigned char* dst, int dstWidth, int dstHeight, const unsigned char* src,
                 int srcWidth, int srcHeight, int step) {
    for (int y = 0; y < dstHeight; ++y) {
        const unsigned char* srcRow =
            src + (size_t)nearest(y, dstHeight, srcHeight) * srcWidth * step;
        unsigned char* dstRow = dst + (size_t)y * dstWidth * step;
        for (int x = 0; x < dstWidth; ++x) {
            memcpy(dstRow + (size_t)x * step,
                   srcRow + (size_t)nearest(x, dstWidth, srcWidth) * step, step);
        }
    }
}

}  // namespace

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
    switch (mType) {
        case IMAGE_TEXTURE:
        case IMAGE_FRAMEBUFFER:
            return initialize2D_l();
        case IMAGE_EXTERNAL:
        case IMAGE_EXTERNAL_FRAMEBUFFER:
            return initializeGraphicBuffer_l();
        default:
            return VC_REPORT(VC_ERROR_UNSUPPORTED);
    }
}

int EglImage::initialize2D_l() {
    if (!GL_CHECK(glGenTextures(1, &mTexture))) return VC_REPORT(VC_ERROR_UNKNOWN);
    if (mType == IMAGE_FRAMEBUFFER) {
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
        if (!complete) {
            glDeleteTextures(1, &mTexture);
            glDeleteFramebuffers(1, &mFrameBuffer);
            mTexture = 0;
            mFrameBuffer = 0;
            // A failed call is a GL error like any other; only a framebuffer
            // that GL calls incomplete is a state error.
            return VC_REPORT(ok ? VC_ERROR_INVALID_STATE : VC_ERROR_UNKNOWN);
        }
    }
    mInitialized = true;
    return 0;
}

void EglImage::dropGraphicBuffer_l() {
    if (mEglImage != EGL_NO_IMAGE_KHR && mEglEnv != nullptr) {
        EglNativeSeam::get().destroyImage(mEglEnv->getEGLDisplay(), mEglImage);
    }
    mEglImage = EGL_NO_IMAGE_KHR;
    mGraphicBuffer.clear();
}

int EglImage::initializeGraphicBuffer_l() {
    uint32_t format = mType == IMAGE_EXTERNAL_FRAMEBUFFER ? VC_FORMAT_RGBA : mFormat;
    int pixelFormat = HalPixelFormat::codeOf(format);
    if (pixelFormat == 0) {
        if (VCImage_isYUV(format)) {
            EglLog(VF_LOG_ERROR, "Unsupported format for the EgImage: %4.4s", (const char*)&format);
        } else {
            EglLog(VF_LOG_ERROR, "Unsupported format for the EglImage: %4.4s",
                   (const char*)&format);
        }
        return VC_REPORT(VC_ERROR_UNSUPPORTED);
    }
    if (mEglEnv == nullptr) {
        EglLog(VF_LOG_ERROR, "EGL: an EglImage on a GraphicBuffer needs an EglEnvironment");
        return VC_REPORT(VC_ERROR_INVALID_STATE);
    }

    uint32_t usage = usageOf(mType);
    EglLog(VF_LOG_DEBUG, "EglImage: Creating GraphicBuffer %dx%d %4.4s (format %d, usage 0x%08x)",
           mWidth, mHeight, (const char*)&format, pixelFormat, usage);
    mGraphicBuffer =
        new GraphicBuffer((uint32_t)mWidth, (uint32_t)mHeight, pixelFormat, usage, "EglImage");
    android::status_t status = mGraphicBuffer->initCheck();
    if (status != android::NO_ERROR) {
        EglLog(VF_LOG_ERROR, "Failed to initialize GraphicBuffer. Error: %s.", strerror(-status));
        mGraphicBuffer.clear();
        return VC_REPORT(VC_ERROR_ALLOC_FAILED);
    }

    EGLDisplay display = mEglEnv->getEGLDisplay();
    mEglImage = EglNativeSeam::get().createNativeBufferImage(display, mGraphicBuffer.get());
    if (mEglImage == EGL_NO_IMAGE_KHR) {
        EGLint error = eglGetError();
        EglLog(VF_LOG_ERROR, "Error: eglCreateImage() failed at %s:%i\n", VC_SOURCE, __LINE__);
        EglLog(VF_LOG_ERROR, "Error: eglGetError() = %i (0x%04X) at %s:%i\n", error, error,
               VC_SOURCE, __LINE__);
        mGraphicBuffer.clear();
        return VC_REPORT(VC_ERROR_UNKNOWN);
    }

    bool ok;
    if (mType == IMAGE_EXTERNAL) {
        const auto glEGLImageTargetTexture2DOES = EglExtensions::get().glEGLImageTargetTexture2DOES;
        ok = GL_CHECK(glGenTextures(1, &mTexture)) &&
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
    } else {
        const auto glEGLImageTargetRenderbufferStorageOES =
            EglExtensions::get().glEGLImageTargetRenderbufferStorageOES;
        ok = GL_CHECK(glGenRenderbuffers(1, &mRenderBuffer)) &&
             GL_CHECK(glBindRenderbuffer(GL_RENDERBUFFER, mRenderBuffer)) &&
             GL_CHECK(glEGLImageTargetRenderbufferStorageOES(GL_RENDERBUFFER,
                                                             (GLeglImageOES)(mEglImage))) &&
             GL_CHECK(glGenFramebuffers(1, &mFrameBuffer)) &&
             GL_CHECK(glBindFramebuffer(GL_FRAMEBUFFER, mFrameBuffer)) &&
             GL_CHECK(glFramebufferRenderbuffer(GL_FRAMEBUFFER, GL_COLOR_ATTACHMENT0,
                                                GL_RENDERBUFFER, mRenderBuffer));
        if (ok && glCheckFramebufferStatus(GL_FRAMEBUFFER) != GL_FRAMEBUFFER_COMPLETE) {
            EglLog(VF_LOG_ERROR, "EGL: GraphicBuffer framebuffer %dx%d is incomplete", mWidth,
                   mHeight);
            ok = false;
        }
        glBindFramebuffer(GL_FRAMEBUFFER, 0);
        glBindRenderbuffer(GL_RENDERBUFFER, 0);
    }
    if (!ok) {
        // Leave nothing behind: the owner may never call release().
        if (mTexture != 0) glDeleteTextures(1, &mTexture);
        if (mFrameBuffer != 0) glDeleteFramebuffers(1, &mFrameBuffer);
        if (mRenderBuffer != 0) glDeleteRenderbuffers(1, &mRenderBuffer);
        mTexture = mFrameBuffer = mRenderBuffer = 0;
        dropGraphicBuffer_l();
        return VC_REPORT(VC_ERROR_UNKNOWN);
    }
    EglLog(VF_LOG_DEBUG, "Successfully created texture for input: %dx%d %4.4s", mWidth, mHeight,
           (const char*)&format);
    mFormat = format;
    mInitialized = true;
    return 0;
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
    if (!mInitialized) {
        EglLog(VF_LOG_ERROR, "EGL: bindTexture mInitialized == false");
        return VC_ERROR_INVALID_STATE;
    }
    if (mType == IMAGE_EXTERNAL) {
        if (!GL_CHECK(glBindTexture(GL_TEXTURE_EXTERNAL_OES, mTexture))) return VC_ERROR_UNKNOWN;
        return 0;
    }
    if (mType == IMAGE_EXTERNAL_FRAMEBUFFER) return VC_REPORT(VC_ERROR_UNSUPPORTED);
    if (!GL_CHECK(glBindTexture(GL_TEXTURE_2D, mTexture))) return VC_ERROR_UNKNOWN;
    return 0;
}

int EglImage::unbindTexture() {
    if (!mInitialized) {
        EglLog(VF_LOG_ERROR, "EGL: not initialized");
        return VC_ERROR_INVALID_STATE;
    }
    if (mType == IMAGE_EXTERNAL) {
        if (!GL_CHECK(glBindTexture(GL_TEXTURE_EXTERNAL_OES, 0))) return VC_ERROR_UNKNOWN;
        return 0;
    }
    if (mType == IMAGE_EXTERNAL_FRAMEBUFFER) return VC_REPORT(VC_ERROR_UNSUPPORTED);
    if (!GL_CHECK(glBindTexture(GL_TEXTURE_2D, 0))) return VC_ERROR_UNKNOWN;
    return 0;
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

int EglImage::setImageData(const unsigned char* data, int sampleType) {
    if (!mInitialized || (mType != IMAGE_TEXTURE && mType != IMAGE_FRAMEBUFFER)) {
        EglLog(VF_LOG_ERROR, "EGL: not initialized");
        return VC_ERROR_INVALID_STATE;
    }
    if (data == nullptr) return VC_REPORT(VC_ERROR_NULL_PARAM);
    bool ok = GL_CHECK(glBindTexture(GL_TEXTURE_2D, mTexture)) &&
              GL_CHECK(glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MIN_FILTER, GL_LINEAR)) &&
              GL_CHECK(glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MAG_FILTER, GL_LINEAR)) &&
              GL_CHECK(glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_S, sampleType)) &&
              GL_CHECK(glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_T, sampleType)) &&
              GL_CHECK(glTexImage2D(GL_TEXTURE_2D, 0, GL_RGBA, mWidth, mHeight, 0, GL_RGBA,
                                    GL_UNSIGNED_BYTE, data));
    return ok ? 0 : VC_REPORT(VC_ERROR_UNKNOWN);
}

int EglImage::setImageData(const VCImage& image, int sampleType) {
    if (!mInitialized) {
        EglLog(VF_LOG_ERROR, "EGL: not initialized");
        return VC_ERROR_INVALID_STATE;
    }
    if (mType == IMAGE_EXTERNAL || mType == IMAGE_EXTERNAL_FRAMEBUFFER) {
        return writeGraphicBuffer(image);
    }
    if (image.data == nullptr) return VC_REPORT(VC_ERROR_NULL_PARAM);
    // GL takes width x height RGBA bytes whatever the record's format says; a
    // record holding fewer would be read past its end.
    if (image.width > 0 && image.height > 0 &&
        (uint64_t)VCImage_size(&image) < (uint64_t)image.width * (uint64_t)image.height * 4) {
        return VC_REPORT(VC_ERROR_INVALID_PARAM);
    }
    bool ok = GL_CHECK(glBindTexture(GL_TEXTURE_2D, mTexture)) &&
              GL_CHECK(glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MIN_FILTER, GL_LINEAR)) &&
              GL_CHECK(glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MAG_FILTER, GL_LINEAR)) &&
              GL_CHECK(glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_S, sampleType)) &&
              GL_CHECK(glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_T, sampleType)) &&
              GL_CHECK(glTexImage2D(GL_TEXTURE_2D, 0, GL_RGBA, image.width, image.height, 0,
                                    GL_RGBA, GL_UNSIGNED_BYTE, image.data));
    return ok ? 0 : VC_REPORT(VC_ERROR_UNKNOWN);
}

int EglImage::writeGraphicBuffer(const VCImage& image) {
    if (image.data == nullptr) return VC_REPORT(VC_ERROR_NULL_PARAM);
    if (mGraphicBuffer == nullptr) {
        EglLog(VF_LOG_ERROR, "EGL: Graphic buffer is NULL");
        return VC_REPORT(VC_ERROR_INVALID_STATE);
    }
    // A wrapping lock: the writes must land in the buffer itself.
    VCImage* target = Platform::lockGraphicBuffer(mGraphicBuffer, Platform::LOCK_WRAP,
                                                  HalPixelFormat::codeOf(mFormat));
    if (target == nullptr) {
        EglLog(VF_LOG_ERROR, "EGL: Failed to lock the graphic buffer");
        return VC_REPORT(VC_ERROR_UNKNOWN);
    }
    int result = writeLocked(image, target);
    VCImage_destroy(target);
    if (mGraphicBuffer->unlock() != android::NO_ERROR) {
        EglLog(VF_LOG_ERROR,
               "Failed to release the GraphicBuffer's pixels. Did you really lock them before?");
        return VC_REPORT(VC_ERROR_UNKNOWN);
    }
    return result;
}

int EglImage::writeLocked(const VCImage& image, VCImage* target) {
    bool sameSize = image.width == target->width && image.height == target->height;
    if (sameSize && image.format == target->format) {
        // Planes one by one: either side may keep its chroma apart from the luma.
        return VCImage_convert(&image, target) == 0 ? 0 : VC_REPORT(VC_ERROR_UNKNOWN);
    }
    if (!sameSize && !(VCImage_isYUV(image.format) && VCImage_isYUV(target->format))) {
        EglLog(VF_LOG_ERROR, "Incompatible image : %dx%d '%4.4s' --> %dx%d '%4.4s'", image.width,
               image.height, (const char*)&image.format, target->width, target->height,
               (const char*)&target->format);
        return VC_REPORT(VC_ERROR_INVALID_PARAM);
    }
    // Converted (at the source size) into a compact image of the buffer's format.
    VCImage* converted = VCImage_createNew(image.width, image.height, target->format);
    if (converted == nullptr) {
        EglLog(VF_LOG_ERROR, "EGL: Cannot create VCImage_createNew");
        return VC_REPORT(VC_ERROR_ALLOC_FAILED);
    }
    int result = VCImage_convert(&image, converted);
    if (result != 0) {
        EglLog(VF_LOG_ERROR, "EGL: image.convert returned %d", result);
        VCImage_destroy(converted);
        return result;
    }
    if (sameSize) {
        result = VCImage_convert(converted, target);
    } else {
        doTransformResizeYUV(target->data, target->width, target->height, converted->data,
                             converted->width, converted->height);
    }
    VCImage_destroy(converted);
    return result == 0 ? 0 : VC_REPORT(VC_ERROR_UNKNOWN);
}

void EglImage::doTransformResizeYUV(unsigned char* dst, int dstWidth, int dstHeight,
                                    unsigned char* src, int srcWidth, int srcHeight) {
    EglLog(VF_LOG_DEBUG, "doTransformResizeYUV E");
    if (dst != nullptr && src != nullptr && dstWidth > 1 && dstHeight > 1 && srcWidth > 1 &&
        srcHeight > 1) {
        size_t dstLuma = (size_t)dstWidth * dstHeight;
        size_t srcLuma = (size_t)srcWidth * srcHeight;
        resizePlane(dst, dstWidth, dstHeight, src, srcWidth, srcHeight, 1);
        if (mFormat == VC_FORMAT_YV12) {
            size_t dstQuarter = dstLuma / 4;
            size_t srcQuarter = srcLuma / 4;
            resizePlane(dst + dstLuma, dstWidth / 2, dstHeight / 2, src + srcLuma, srcWidth / 2,
                        srcHeight / 2, 1);
            resizePlane(dst + dstLuma + dstQuarter, dstWidth / 2, dstHeight / 2,
                        src + srcLuma + srcQuarter, srcWidth / 2, srcHeight / 2, 1);
        } else {
            // Interleaved chroma: each pair moves as one two-byte sample.
            resizePlane(dst + dstLuma, dstWidth / 2, dstHeight / 2, src + srcLuma, srcWidth / 2,
                        srcHeight / 2, 2);
        }
    }
    EglLog(VF_LOG_DEBUG, "doTransformResizeYUV X");
}

VCImage* EglImage::getImageData() {
    if (!mInitialized) {
        EglLog(VF_LOG_ERROR, "EGL: not initialized");
        return nullptr;
    }
    if (mType == IMAGE_FRAMEBUFFER) {
        VCImage* wrap = VCImage_createNew(mWidth, mHeight, VC_FORMAT_RGBA);
        if (wrap == nullptr) {
            VC_REPORT(VC_ERROR_ALLOC_FAILED);
            return nullptr;
        }
        bool ok = GL_CHECK(glBindFramebuffer(GL_FRAMEBUFFER, mFrameBuffer)) &&
                  GL_CHECK(glReadPixels(0, 0, mWidth, mHeight, GL_RGBA, GL_UNSIGNED_BYTE,
                                        (GLvoid*)(wrap->data)));
        unbindFrameBuffer();
        if (!ok) {
            VCImage_destroy(wrap);
            VC_REPORT(VC_ERROR_UNKNOWN);
            return nullptr;
        }
        return wrap;
    }
    if (mType != IMAGE_EXTERNAL && mType != IMAGE_EXTERNAL_FRAMEBUFFER) return nullptr;
    if (mGraphicBuffer == nullptr) {
        EglLog(VF_LOG_ERROR, "EGL: Graphic buffer is NULL");
        return nullptr;
    }
    // Unlocked before returning, so writes to the image never reach the GPU:
    // a read lock spares the buffer from watching for them.
    VCImage* image = Platform::lockGraphicBuffer(mGraphicBuffer, Platform::LOCK_COMPACT,
                                                 Platform::kImplementationDefinedFormat,
                                                 GraphicBuffer::USAGE_SW_READ_OFTEN);
    if (image == nullptr) {
        EglLog(VF_LOG_ERROR, "EGL: Failed to lock the graphic buffer");
        return nullptr;
    }
    mGraphicBuffer->unlock();
    const unsigned char* chroma = nullptr;
    if (VCImage_isYUV420(image->format) && image->data != nullptr) {
        chroma = image->data + (image->uvOffset != 0 ? image->uvOffset
                                                     : (uint32_t)(image->width * image->height));
    }
    EglLog(VF_LOG_DEBUG, "EGL: GraphicBuffer at: %dx%d Y:%p UV:%p", image->width, image->height,
           (const void*)image->data, (const void*)chroma);
    return image;
}

int EglImage::flushCache() {
    if (!mInitialized) {
        EglLog(VF_LOG_ERROR, "EGL: not initialized");
        return VC_ERROR_INVALID_STATE;
    }
    if (mType == IMAGE_FRAMEBUFFER || mType == IMAGE_EXTERNAL_FRAMEBUFFER) {
        // Ends with the default framebuffer bound: a caller that draws into
        // this one afterwards binds it again.
        GLubyte texel[4];
        bool ok = GL_CHECK(glBindFramebuffer(GL_FRAMEBUFFER, mFrameBuffer)) &&
                  GL_CHECK(glReadPixels(0, 0, 1, 1, GL_RGBA, GL_UNSIGNED_BYTE, &texel));
        unbindFrameBuffer();
        if (!ok) return VC_REPORT(VC_ERROR_UNKNOWN);
    }
    if (mType == IMAGE_EXTERNAL || mType == IMAGE_EXTERNAL_FRAMEBUFFER) {
        if (mGraphicBuffer == nullptr) {
            EglLog(VF_LOG_ERROR, "EGL: Graphic buffer is NULL");
            return VC_ERROR_INVALID_STATE;
        }
        // A read lock brings the GPU's rendering into the CPU's view.
        void* pixels = nullptr;
        if (mGraphicBuffer->lock(GraphicBuffer::USAGE_SW_READ_OFTEN, &pixels) !=
            android::NO_ERROR) {
            EglLog(VF_LOG_ERROR, "EGL: Failed to lock the graphic buffer");
            return VC_REPORT(VC_ERROR_UNKNOWN);
        }
        mGraphicBuffer->unlock();
    }
    return 0;
}
