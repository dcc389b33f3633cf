#include "core/egl/EglSnapShot.h"

#include <GLES2/gl2.h>
#include <GLES2/gl2ext.h>

#include "core/egl/EglCheck.h"
#include "core/egl/Platform.h"
#include "vccore/vc_geometry.h"
#include "vccore/vc_log.h"

#define VC_SOURCE "core/egl/EglSnapShot"

using android::Mutex;
using android::sp;

namespace {

const EglSnapShotNames kNames = {"KI-TAKEPICTURE_GETIMAGE", "KI-TAKEPICTURE_CONVERT",
                                 "KI-TAKEPICTURE_CONVERTANDPOST"};
const char kSyncSignature[] =
    "int EglSnapShot::takePictureSync(const VCImage*, const VCImage*, const "
    "android::sp<EglProgram>&, OnFrameListener&, nsecs_t)";
const char kAsyncSignature[] =
    "int EglSnapShot::takePictureAsync(const VCImage*, const VCImage*, const "
    "android::sp<EglProgram>&, OnFrameListener&, nsecs_t, EGLTimeKHR)";
// Qualcomm's switch for textures and render targets up to 8192.
const GLenum kEnable8KTexturesQcom = 0x8FBC;
// A second is far longer than any capture takes to post.
const nsecs_t kDefaultPreviousCaptureTimeout = 1000000000LL;

const char* fourcc(const uint32_t& format) {
    return reinterpret_cast<const char*>(&format);
}

bool isYuvFormat(uint32_t format) {
    return VCImage_isYUV(format) != 0;
}

}  // namespace

EglSnapShot::EglSnapShot(const sp<EglEnvironment>& env, int width, int height,
                         sp<ImageConverter>& converter)
    : EglObject(width, height),
      mEglEnv(env),
      mConverter(converter),
      mBuffers(std::make_shared<EglSnapShotBuffers>()),
      mWorkQueue(1, false),
      mImagesBusy(false),
      mPreviousCaptureTimeout(kDefaultPreviousCaptureTimeout) {
    setTexture8K(true);
    int fittedWidth = width, fittedHeight = height;
    fixSupportedSize(width, height, fittedWidth, fittedHeight);
    mWidth = fittedWidth;
    mHeight = fittedHeight;
}

EglSnapShot::~EglSnapShot() {
    mWorkQueue.finish();
}

int EglSnapShot::initialize_l() {
    mBuffers->open();
    return EglSnapShot_makeTarget(mEglEnv, mWidth, mHeight, mTarget);
}

void EglSnapShot::release_l() {
    EglSnapShot_drainQueue(mWorkQueue);
    mBuffers->close();
    for (sp<EglImage>& image : mInputs) {
        if (image != nullptr) image->release();
        image.clear();
    }
    if (mTarget != nullptr) mTarget->release();
    mTarget.clear();
}

void EglSnapShot::fixSupportedSize(int w, int h, int& outW, int& outH) {
    const int64_t max = Platform::getMaximumTextureSize();
    outW = w;
    outH = h;
    if (w <= max && h <= max) return;
    if (w < 1 || h < 1) return;
    const int64_t h1 = std::min<int64_t>(max, h);
    const int64_t w1 = std::min<int64_t>(max, w);
    outH = static_cast<int>(std::min<int64_t>(h1, w1 * h / w));
    outW = static_cast<int>(std::min<int64_t>(static_cast<int64_t>(outH) * w / h, w1));
    EglLog(VF_LOG_DEBUG,
           "EGL: The specified dimensions are above OpenGL's capabilities! Cropping to %dx%d "
           "pixels.",
           outW, outH);
}

VCImage* EglSnapShot::cropImageSupportedSize(const VCImage* image) {
    if (image == nullptr) return nullptr;
    auto wrapWhole = [image] {
        return VCImage_createWrap(image->data, image->width, image->height, image->format,
                                  static_cast<int>(image->size), image->uvOffset);
    };
    if (image->data != nullptr && image->width <= mWidth && image->height <= mHeight)
        return wrapWhole();
    EglLog(VF_LOG_DEBUG,
           "The input image is too big for this framebuffer! %dx%d > %d. Cropping input image!",
           image->width, image->height, Platform::getMaximumTextureSize());
    VCImage* cropped = VCImage_createNew(mWidth, mHeight, image->format);
    const int x = ((image->width - mWidth) / 2) & ~1;
    const int y = ((image->height - mHeight) / 2) & ~1;
    const int status =
        cropped != nullptr ? VCImage_crop(image, cropped, x, y) : VC_ERROR_ALLOC_FAILED;
    if (status < 0) {
        EglLog(VF_LOG_ERROR, "Failed to crop the input image (%d). This is quite bad!", status);
        VCImage_destroy(cropped);
        return wrapWhole();
    }
    return cropped;
}

void EglSnapShot::setTexture8K(bool on) {
    if (Platform::getCurrentPlatform() != Platform::PLATFORM_MSM8974) return;
    if (on)
        GL_CHECK(glEnable(kEnable8KTexturesQcom));
    else
        GL_CHECK(glDisable(kEnable8KTexturesQcom));
    GLint size = 0;
    GL_CHECK(glGetIntegerv(GL_MAX_TEXTURE_SIZE, &size));
    EglLog(VF_LOG_DEBUG,
           on ? "EGL: Enable GL_ENABLE_8K_TEXTURES_AND_RENDERING_QCOM, size = %d"
              : "EGL: Disable GL_ENABLE_8K_TEXTURES_AND_RENDERING_QCOM, size = %d",
           size);
}

int EglSnapShot::eglFlush() {
    unsigned char scratch[4];
    if (!GL_CHECK(glReadPixels(0, 0, 1, 1, GL_RGBA, GL_UNSIGNED_BYTE, scratch)) ||
        !GL_CHECK(glFinish()))
        return VC_REPORT(VC_ERROR_UNKNOWN);
    return 0;
}

// Checks the pictures, waits until the previous capture has given back the
// images, then takes them.
int EglSnapShot::beginCapture(const VCImage* base, const VCImage* pip,
                              const sp<EglProgram>& program, const char* function) {
    if (base == nullptr || program == nullptr ||
        (program->getCameraMode() / 10 == 2 && pip == nullptr))
        return VC_REPORT(VC_ERROR_NULL_PARAM);
    Mutex::Autolock lock(mLock);
    if (mImagesBusy) {
        EglLog(VF_LOG_DEBUG, "In %s, Waiting for previous jobs to complete...", function);
        const nsecs_t deadline = systemTime(SYSTEM_TIME_MONOTONIC) + mPreviousCaptureTimeout;
        while (mImagesBusy) {
            const nsecs_t left = deadline - systemTime(SYSTEM_TIME_MONOTONIC);
            const int status = left > 0 ? mCondition.waitRelative(mLock, left) : -ETIMEDOUT;
            if (status == -ETIMEDOUT) {
                EglLog(VF_LOG_ERROR, "Timed out!");
                return VC_REPORT(VC_ERROR_INVALID_STATE);
            }
            if (status != 0) {
                EglLog(VF_LOG_ERROR, "Unknown error while waiting: %d", status);
                return VC_REPORT(VC_ERROR_INVALID_STATE);
            }
        }
    }
    mImagesBusy = true;
    return 0;
}

void EglSnapShot::giveBackImages() {
    Mutex::Autolock lock(mLock);
    mImagesBusy = false;
    mCondition.broadcast();
}

void EglSnapShot::abandonCapture() {
    giveBackImages();
}

// A buffer-backed external texture holding picture, on texture unit `unit`.
// The slot's image is kept from capture to capture while the picture's
// geometry and format stay.
int EglSnapShot::upload(sp<EglImage>& slot, const VCImage* picture, int unit, const char* initLabel,
                        const char* setLabel) {
    uint32_t format = picture->format;
    // Made on its own unit too: making an image binds (and leaves) its texture
    // on the active unit, which must not be the other picture's.
    GL_CHECK(glActiveTexture(GL_TEXTURE0 + unit));
    int status = 0;
    {
        VFTraceSection trace(initLabel);
        if (!Platform::isNativeInputFormat(format)) {
            const uint32_t from = format;
            format = Platform::getPreferredInputFormat(isYuvFormat(from));
            EglLog(VF_LOG_ERROR,
                   "Input format '%4.4s' is not a native format for EglImage: Conversion required "
                   "to %4.4s",
                   fourcc(from), fourcc(format));
        }
        if (slot != nullptr &&
            (slot->getWidth() != picture->width || slot->getHeight() != picture->height ||
             slot->getFormat() != format)) {
            slot->release();
            slot.clear();
        }
        if (slot == nullptr) {
            slot = new EglImage(mEglEnv, EglImage::IMAGE_EXTERNAL, picture->width, picture->height,
                                static_cast<int>(format));
            status = slot->initialize();
            if (status != 0) {
                slot->release();
                slot.clear();
            }
        }
    }
    if (status == 0) status = slot->bindTexture();
    if (status == 0) {
        VFTraceSection trace(setLabel);
        status = slot->setImageData(*picture, GL_CLAMP_TO_EDGE);
    }
    GL_CHECK(glActiveTexture(GL_TEXTURE0));
    return status;
}

// Steps shared by both paths up to the draw; the synchronous one also waits
// for the GPU. On failure the images are given back.
int EglSnapShot::prepare(const VCImage* base, const VCImage* pip, const sp<EglProgram>& program,
                         bool finish) {
    VCImage* pictures[2] = {cropImageSupportedSize(base), cropImageSupportedSize(pip)};
    int status = 0;
    if (mTarget == nullptr) status = VC_REPORT(VC_ERROR_INVALID_STATE);
    if (status == 0)
        status = upload(mInputs[0], pictures[0], 0, "KI-TAKEPICTURE_INIT_BASE",
                        "KI-TAKEPICTURE_SETIMAGE_BASE");
    if (status == 0 && pictures[1] != nullptr)
        status = upload(mInputs[1], pictures[1], 1, "KI-TAKEPICTURE_INIT_PIP",
                        "KI-TAKEPICTURE_SETIMAGE_PIP");
    if (status == 0) status = mTarget->bindFrameBuffer();
    if (status == 0) {
        VFTraceSection trace("KI-TAKEPICTURE_DRAW");
        const int cameraWidth = program->getCameraWidth(),
                  cameraHeight = program->getCameraHeight();
        const int cameraWidth2 = program->getCameraWidth2();
        const int cameraHeight2 = program->getCameraHeight2();
        const int previewWidth = program->getPreviewWidth();
        const int previewHeight = program->getPreviewHeight();
        const bool previewFlip = program->getPreviewFlip();
        program->setCameraGeometry(pictures[0]->width, pictures[0]->height,
                                   pictures[1] != nullptr ? pictures[1]->width : 0,
                                   pictures[1] != nullptr ? pictures[1]->height : 0);
        program->setPreviewGeometry(mWidth, mHeight, false);
        status = program->onDrawFrame();
        if (status == 0) status = finish ? eglFlush() : (GL_CHECK(glFlush()) ? 0 : -1);
        mTarget->unbindFrameBuffer();
        // A program that never had a geometry is left with the picture's.
        if (cameraWidth > 0 && cameraHeight > 0)
            program->setCameraGeometry(cameraWidth, cameraHeight, cameraWidth2, cameraHeight2);
        if (previewWidth > 0 && previewHeight > 0)
            program->setPreviewGeometry(previewWidth, previewHeight, previewFlip);
    }
    VCImage_destroy(pictures[0]);
    VCImage_destroy(pictures[1]);
    if (status != 0) giveBackImages();
    return status;
}

int EglSnapShot::syncTail(OnFrameListener& listener, nsecs_t timestamp, bool dual) {
    const int status = readAndPost(listener, timestamp);
    if (status != 0) {
        EglLog(VF_LOG_ERROR, "EGL: takePicture failed [sync] in readAndPost(): %d", status);
        if (dual) EglLog(VF_LOG_ERROR, "takePicture failed with dual picture: %d", status);
    }
    return status;
}

int EglSnapShot::takePictureSync(const VCImage* base, const VCImage* pip,
                                 const sp<EglProgram>& program, OnFrameListener& listener,
                                 nsecs_t timestamp) {
    int status = beginCapture(base, pip, program, kSyncSignature);
    if (status == 0) status = prepare(base, pip, program, true);
    if (status != 0) return status;
    EglLog(VF_LOG_DEBUG, "EGL: Synchronously waiting for rendering...");
    return syncTail(listener, timestamp, pip != nullptr);
}

int EglSnapShot::takePictureAsync(const VCImage* base, const VCImage* pip,
                                  const sp<EglProgram>& program, OnFrameListener& listener,
                                  nsecs_t timestamp, EGLTimeKHR timeout) {
    int status = beginCapture(base, pip, program, kAsyncSignature);
    if (status == 0) status = prepare(base, pip, program, false);
    if (status != 0) return status;
    EglLog(VF_LOG_DEBUG, "EGL: Asynchronously waiting for rendering...");
    const EGLDisplay display = mEglEnv->getEGLDisplay();
    EGLSyncKHR sync = EglSnapShot_createFence(display, VC_SOURCE);
    if (sync == EGL_NO_SYNC_KHR) {
        // No fence: the synchronous tail, here on the render thread.
        if (!GL_CHECK(glFinish())) {
            giveBackImages();
            return VC_REPORT(VC_ERROR_UNKNOWN);
        }
        return syncTail(listener, timestamp, pip != nullptr);
    }
    EglSnapShotWaitJob* job = new EglSnapShotWaitJob(*this, listener, timestamp, display, sync,
                                                     static_cast<uint64_t>(timeout));
    status = mWorkQueue.schedule(job, 2);
    if (status != 0) {
        EglLog(VF_LOG_ERROR, "EGL: Work queue failed [%s]: %d", kAsyncSignature, status);
        delete job;
        giveBackImages();
        return status;
    }
    EglLog(VF_LOG_DEBUG, "EGL: Asynchronous snapshot fence waiting job created.");
    return 0;
}

int EglSnapShot::readAndPost(OnFrameListener& listener, nsecs_t timestamp) {
    int status = mTarget == nullptr
                     ? VC_REPORT(VC_ERROR_INVALID_STATE)
                     : EglSnapShot_readAndPost(*mTarget, *mConverter, mBuffers, mWidth, mHeight,
                                               listener, timestamp, kNames);
    if (status == kEglSnapShotReportUnknown) status = VC_REPORT(VC_ERROR_UNKNOWN);
    // A render thread waiting to capture again may go on.
    giveBackImages();
    return status;
}
