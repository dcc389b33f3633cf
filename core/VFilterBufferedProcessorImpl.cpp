#include "core/VFilterBufferedProcessorImpl.h"

#include <GLES2/gl2.h>
#include <GLES2/gl2ext.h>
#include <string.h>

#include <new>

#include "core/KivBuiltInFilterCatalog.h"
#include "core/KivEffectSelection.h"
#include "core/KivFilter.h"
#include "core/KivImaging.h"
#include "core/egl/EglCheck.h"
#include "core/egl/EglEnvironment.h"
#include "core/egl/EglImage.h"
#include "core/egl/EglProgram.h"
#include "core/egl/EglWindowSurface.h"
#include "core/egl/Platform.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_error.h"
#include "vccore/vc_image.h"
#include "vccore/vc_log.h"

#define VC_SOURCE "core/VFilterBufferedProcessorImpl"

#ifndef GL_ENABLE_8K_TEXTURES_AND_RENDERING_QCOM
#define GL_ENABLE_8K_TEXTURES_AND_RENDERING_QCOM 0x8FBC
#endif

pthread_t gOpenGLManagerThread = 0;

namespace {

// The pass-through effect every processor falls back to.
const int kNoEffectId = 400;

// Qualcomm msm8974 needs its 8K texture switch around each draw.
bool isMsm8974() {
    return Platform::getCurrentPlatform() == Platform::PLATFORM_MSM8974;
}

void destroyImage(VCImage*& image) {
    if (image != nullptr) VCImage_destroy(image);
    image = nullptr;
}

// Formats whose textures are sampled as YUV (grey counts as YUV).
bool isYuvFormat(uint32_t format) {
    return VCImage_isYUV(format) != 0;
}

}  // namespace

VFilterBufferedProcessor* VFilterBufferedProcessor::create() {
    return new VFilterBufferedProcessorImpl();
}

VFilterBufferedProcessorImpl::VFilterBufferedProcessorImpl()
    : mCatalog(new KivBuiltInFilterCatalog(BUILT_IN_FILTER_MORVANE)),
      mFilter(nullptr),
      mMaxTextureSize(0) {
    gOpenGLManagerThread = pthread_self();
}

VFilterBufferedProcessorImpl::~VFilterBufferedProcessorImpl() {
    // GL objects were released by release(); only references are dropped here.
    // The effect holds no GL object of its own once its program is gone.
    deleteEffect();
    mCatalog.clear();
    mProgram.clear();
    mSurface.clear();
    mEglEnv.clear();
    gOpenGLManagerThread = 0;
}

int VFilterBufferedProcessorImpl::initialize() {
    EglLog(VF_LOG_DEBUG, "%s", "virtual int VFilterBufferedProcessorImpl::initialize()");
    initializeGL();
    return 0;
}

int VFilterBufferedProcessorImpl::initializeGL() {
    EglLog(VF_LOG_DEBUG, "%s", "int VFilterBufferedProcessorImpl::initializeGL()");
    mEglEnv = new EglEnvironment();
    mEglEnv->initialize();
    mSurface = new EglWindowSurface(mEglEnv);
    mSurface->initialize();
    // Not bound here: every process call binds it for its own draw.
    return 0;
}

int VFilterBufferedProcessorImpl::release() {
    EglLog(VF_LOG_DEBUG, "%s", "virtual int VFilterBufferedProcessorImpl::release()");
    deleteEffect();
    releaseFromGL();
    return 0;
}

int VFilterBufferedProcessorImpl::releaseFromGL() {
    EglLog(VF_LOG_DEBUG, "%s", "int VFilterBufferedProcessorImpl::releaseFromGL()");
    if (mSurface != nullptr) {
        mSurface->unbindSurface();
        mSurface->release();
        mSurface.clear();
    }
    if (mEglEnv != nullptr) {
        mEglEnv->release();
        mEglEnv.clear();
    }
    return 0;
}

void VFilterBufferedProcessorImpl::deleteEffect() {
    if (mFilter != nullptr) {
        delete mFilter;
        mFilter = nullptr;
    }
}

int VFilterBufferedProcessorImpl::setEffect(int id) {
    EglLog(VF_LOG_DEBUG, "%s : %d", "virtual int VFilterBufferedProcessorImpl::setEffect(int)", id);
    deleteEffect();
    mFilter = KivImaging_create(id, nullptr);
    if (mFilter == nullptr) mFilter = KivImaging_create(kNoEffectId, nullptr);
    return 0;
}

int VFilterBufferedProcessorImpl::setEffect(const char* name) {
    EglLog(VF_LOG_DEBUG, "%s : %s",
           "virtual int VFilterBufferedProcessorImpl::setEffect(const char*)",
           name != nullptr ? name : "(null)");
    if (name == nullptr) {
        // No name to look up or to load: the fallback effect.
        deleteEffect();
        mFilter = KivImaging_create(kNoEffectId, nullptr);
        return 0;
    }
    // No program exists between calls, so there is nothing to detach from.
    mFilter = KivSelectEffectByName(
        *mCatalog, mFilter, name, [](KivFilter*) {}, nullptr, KIV_SELECT_ALWAYS_NEW);
    return 0;
}

int VFilterBufferedProcessorImpl::setEffectParameter(const char* parameter) {
    EglLog(VF_LOG_DEBUG, "%s : %s",
           "virtual int VFilterBufferedProcessorImpl::setEffectParameter(const char*)",
           parameter != nullptr ? parameter : "(null)");
    if (mFilter != nullptr) mFilter->setOption("parameter", parameter);
    return 0;
}

int VFilterBufferedProcessorImpl::bindGLEnvironment() {
    if (mSurface == nullptr || mSurface->bindSurface() != 0) {
        return VC_REPORT(VC_ERROR_INVALID_STATE);
    }
    mProgram = new EglProgram();
    mProgram->setCameraGeometryType(EglProgram::GEOMETRY_NORMAL, 0);
    if (mFilter != nullptr) mProgram->setFilter(mFilter);
    if (isMsm8974()) {
        glEnable(GL_ENABLE_8K_TEXTURES_AND_RENDERING_QCOM);
        glGetIntegerv(GL_MAX_TEXTURE_SIZE, &mMaxTextureSize);
        EglLog(VF_LOG_ERROR, "EGL: Enable GL_ENABLE_8K_TEXTURES_AND_RENDERING_QCOM, size = %d",
               mMaxTextureSize);
    }
    if (mProgram->initialize(10, false) != 0) {
        EglLog(VF_LOG_ERROR, "EGL: Program could not be loaded.");
        return VC_REPORT(VC_ERROR_INVALID_STATE);
    }
    return 0;
}

int VFilterBufferedProcessorImpl::unbindGLEnvironment() {
    if (isMsm8974()) {
        glDisable(GL_ENABLE_8K_TEXTURES_AND_RENDERING_QCOM);
        glGetIntegerv(GL_MAX_TEXTURE_SIZE, &mMaxTextureSize);
        EglLog(VF_LOG_ERROR, "EGL: Disable GL_ENABLE_8K_TEXTURES_AND_RENDERING_QCOM, size = %d",
               mMaxTextureSize);
    }
    if (mProgram != nullptr) {
        // Effects with GL objects of their own hand them over now, while this
        // call's context is current; nothing of theirs outlives the call.
        mProgram->setFilter(nullptr);
        mProgram->getRecycler()->recycle();
        mProgram->release();
        mProgram.clear();
    }
    glReleaseShaderCompiler();
    if (mSurface != nullptr) mSurface->unbindSurface();
    return 0;
}

namespace {

// Draws the bound program into `target` from `source` at width x height and
// returns the target's pixels (owned by the caller, wrapping the target's
// buffer), or null after logging.
VCImage* drawAndReadBack(EglProgram& program, EglImage& target, EglImage& source, int width,
                         int height) {
    program.setCameraGeometry(width, height, 0, 0);
    program.setPreviewGeometry(width, height, false);
    // The target is new and nothing was drawn into it: flushCache() would only
    // read back the zeros it was made with (a full copy on the host), so it
    // is left out.
    if (target.bindFrameBuffer() != 0) return nullptr;
    program.onDrawFrame();
    glFinish();
    // One texel read forces the draw to complete before the buffer is read.
    uint32_t texel = 0;
    glReadPixels(0, 0, 1, 1, GL_RGBA, GL_UNSIGNED_BYTE, &texel);
    EglLog(VF_LOG_DEBUG, "EGL: Synchronously waiting for rendering...");
    target.unbindFrameBuffer();
    source.unbindTexture();
    VCImage* pixels = target.getImageData();
    if (pixels == nullptr) {
        EglLog(VF_LOG_ERROR, "EGL: Can't access this FBO's pixels");
        VC_REPORT(VC_ERROR_UNKNOWN);
    }
    return pixels;
}

void releaseImage(android::sp<EglImage>& image) {
    if (image != nullptr) {
        image->release();
        image.clear();
    }
}

}  // namespace

int VFilterBufferedProcessorImpl::doProcessRGBA(const unsigned char* input, int width, int height,
                                                unsigned char* output, int format) {
    EglLog(VF_LOG_DEBUG, "%s",
           "int VFilterBufferedProcessorImpl::doProcessRGBA(const unsigned char*, int, int, "
           "unsigned char*, int)");
    if (output == nullptr || input == nullptr) return VC_ERROR_INVALID_PARAM;
    const bool bgra = static_cast<uint32_t>(format) == VC_FORMAT_BGRA;

    VCImage* wrapped = nullptr;  // the caller's pixels, never freed here
    VCImage* rgba = nullptr;     // what is uploaded
    VCImage* readBack = nullptr;
    VCImage* converted = nullptr;
    android::sp<EglImage> target;
    android::sp<EglImage> source;

    // The input is wrapped, not copied; BGRA needs one conversion to RGBA.
    unsigned char* pixels = const_cast<unsigned char*>(input);
    wrapped = VCImage_createEmpty(width, height, bgra ? VC_FORMAT_BGRA : VC_FORMAT_RGBA);
    if (wrapped != nullptr) {
        wrapped->data = pixels;
        wrapped->wrapped = 1;
        wrapped->size = VCImage_requiredSize(width, height, wrapped->format);
    }
    if (wrapped == nullptr) {
        VC_REPORT(VC_ERROR_UNKNOWN);
    } else if (bgra) {
        rgba = VCImage_createNew(width, height, VC_FORMAT_RGBA);
        if (rgba == nullptr || VCImage_convert(wrapped, rgba) != 0) {
            destroyImage(rgba);
            VC_REPORT(VC_ERROR_UNKNOWN);
        }
    } else {
        rgba = wrapped;
        wrapped = nullptr;
    }
    if (rgba == nullptr) {
        destroyImage(wrapped);
        unbindGLEnvironment();
        return 0;
    }

    if (bindGLEnvironment() != 0) {
        destroyImage(wrapped);
        destroyImage(rgba);
        return VC_REPORT(VC_ERROR_INVALID_STATE);
    }
    glClearColor(0, 0, 0, 1);
    glClear(GL_COLOR_BUFFER_BIT);

    target = new (std::nothrow)
        EglImage(mEglEnv, EglImage::IMAGE_EXTERNAL_FRAMEBUFFER, width, height, VC_FORMAT_RGBA);
    if (target == nullptr) {
        destroyImage(wrapped);
        destroyImage(rgba);
        unbindGLEnvironment();
        return VC_REPORT(VC_ERROR_INVALID_STATE);
    }
    target->initialize();
    source = new (std::nothrow)
        EglImage(mEglEnv, EglImage::IMAGE_EXTERNAL, width, height, VC_FORMAT_RGBA);

    glActiveTexture(GL_TEXTURE0);
    if (source != nullptr && source->initialize() == 0 && source->bindTexture() == 0 &&
        source->setImageData(*rgba, GL_CLAMP_TO_EDGE) == 0 && target->bindFrameBuffer() == 0) {
        readBack = drawAndReadBack(*mProgram, *target, *source, width, height);
    }
    if (readBack != nullptr) {
        if (bgra) {
            converted = VCImage_createNew(readBack->width, readBack->height, VC_FORMAT_BGRA);
            if (converted == nullptr || VCImage_convert(readBack, converted) != 0) {
                VC_REPORT(VC_ERROR_UNKNOWN);
            } else {
                memcpy(output, converted->data,
                       VCImage_requiredSize(readBack->width, readBack->height, VC_FORMAT_BGRA));
            }
        } else {
            memcpy(output, readBack->data,
                   VCImage_requiredSize(readBack->width, readBack->height, VC_FORMAT_RGBA));
        }
    }

    destroyImage(wrapped);
    destroyImage(rgba);
    destroyImage(readBack);
    destroyImage(converted);
    releaseImage(target);
    releaseImage(source);
    unbindGLEnvironment();
    return 0;
}

int VFilterBufferedProcessorImpl::doProcessNV21(const unsigned char* input, int width, int height,
                                                unsigned char* output) {
    EglLog(VF_LOG_DEBUG, "%s",
           "int VFilterBufferedProcessorImpl::doProcessNV21(const unsigned char*, int, int, "
           "unsigned char*)");
    if (output == nullptr || input == nullptr) return VC_ERROR_INVALID_PARAM;

    // YUV 4:2:0 needs even sizes: odd ones are padded by one row or column.
    const int w = width + (width & 1);
    const int h = height + (height & 1);
    VCImage* nv21 = nullptr;
    if (w != width || h != height) {
        nv21 = (width > 0 && height > 0) ? VCImage_createNew(w, h, VC_FORMAT_NV21) : nullptr;
        if (nv21 != nullptr) {
            for (int row = 0; row < height; ++row)
                memcpy(nv21->data + static_cast<size_t>(row) * w,
                       input + static_cast<size_t>(row) * width, width);
            // The chroma block is taken as is, without re-striding: right for
            // even widths (odd height only), approximate otherwise.
            memcpy(nv21->data + static_cast<size_t>(w) * h,
                   input + static_cast<size_t>(width) * height, static_cast<size_t>(w) * h / 2);
        }
    } else {
        nv21 = VCImage_createEmpty(width, height, VC_FORMAT_NV21);
        if (nv21 != nullptr) {
            nv21->data = const_cast<unsigned char*>(input);
            nv21->wrapped = 1;
            nv21->size = VCImage_requiredSize(width, height, VC_FORMAT_NV21);
        }
    }
    if (nv21 == nullptr) return VC_REPORT(VC_ERROR_INVALID_STATE);

    if (bindGLEnvironment() != 0) {
        destroyImage(nv21);
        return VC_REPORT(VC_ERROR_INVALID_STATE);
    }
    glClearColor(0, 0, 0, 1);
    glClear(GL_COLOR_BUFFER_BIT);

    android::sp<EglImage> target = new (std::nothrow)
        EglImage(mEglEnv, EglImage::IMAGE_EXTERNAL_FRAMEBUFFER, w, h, VC_FORMAT_RGBA);
    if (target == nullptr) {
        unbindGLEnvironment();
        destroyImage(nv21);
        return VC_REPORT(VC_ERROR_INVALID_STATE);
    }
    target->initialize();

    uint32_t textureFormat = VC_FORMAT_NV21;
    if (!Platform::isNativeInputFormat(VC_FORMAT_NV21)) {
        textureFormat = Platform::getPreferredInputFormat(isYuvFormat(VC_FORMAT_NV21));
        uint32_t from = VC_FORMAT_NV21;
        EglLog(VF_LOG_ERROR,
               "Input format '%4.4s' is not a native format for EglImage: Conversion required to "
               "%4.4s",
               reinterpret_cast<const char*>(&from), reinterpret_cast<const char*>(&textureFormat));
    }
    android::sp<EglImage> source = new (std::nothrow)
        EglImage(mEglEnv, EglImage::IMAGE_EXTERNAL, w, h, static_cast<int>(textureFormat));

    VCImage* readBack = nullptr;
    glActiveTexture(GL_TEXTURE0);
    if (source != nullptr && source->initialize() == 0 && source->bindTexture() == 0 &&
        source->setImageData(*nv21, GL_CLAMP_TO_EDGE) == 0 && target->bindFrameBuffer() == 0) {
        readBack = drawAndReadBack(*mProgram, *target, *source, w, h);
    }
    if (readBack != nullptr) {
        memcpy(output, readBack->data, VCImage_requiredSize(w, h, VC_FORMAT_RGBA));
    }

    destroyImage(nv21);
    destroyImage(readBack);
    releaseImage(target);
    releaseImage(source);
    unbindGLEnvironment();
    return 0;
}

extern "C" VFilterBufferedProcessor* BufferedProcessor_Create() {
    EglLog(VF_LOG_DEBUG, "EGL: BufferedProcessor_Create");
    return VFilterBufferedProcessor::create();
}

extern "C" void BufferedProcessor_Destroy(VFilterBufferedProcessor* processor) {
    EglLog(VF_LOG_DEBUG, "EGL: BufferedProcessor_Destroy");
    if (processor == nullptr) return;
    delete processor;
}

extern "C" int BufferedProcessor_GetVersion() {
    return 3;
}
