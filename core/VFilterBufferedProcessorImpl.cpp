#include "core/VFilterBufferedProcessorImpl.h"

#include <GLES2/gl2.h>
#include <GLES2/gl2ext.h>
#include <string.h>

#include <memory>
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

using ImageHandle = std::unique_ptr<VCImage, void (*)(VCImage*)>;

ImageHandle owned(VCImage* image) {
    return ImageHandle(image, VCImage_destroy);
}

// The caller's pixels as a record, not copied.
ImageHandle wrapInput(const unsigned char* input, int width, int height, uint32_t format) {
    return owned(VCImage_createWrap(const_cast<unsigned char*>(input), width, height, format,
                                    (int)VCImage_requiredSize(width, height, format), 0));
}

// A GPU image of one call, released on the GL thread when the call ends.
class CallImage {
public:
    CallImage(EglImage* image) : mImage(image) {}
    CallImage(const CallImage&) = delete;
    CallImage& operator=(const CallImage&) = delete;
    ~CallImage() {
        if (mImage != nullptr) mImage->release();
    }
    EglImage* operator->() const { return mImage.get(); }
    bool operator==(std::nullptr_t) const { return mImage == nullptr; }

private:
    android::sp<EglImage> mImage;
};

}  // namespace

int VFilterBufferedProcessorImpl::doProcessRGBA(const unsigned char* input, int width, int height,
                                                unsigned char* output, int format) {
    EglLog(VF_LOG_DEBUG, "%s",
           "int VFilterBufferedProcessorImpl::doProcessRGBA(const unsigned char*, int, int, "
           "unsigned char*, int)");
    if (output == nullptr || input == nullptr) return VC_ERROR_INVALID_PARAM;
    // BGRA goes straight into the RGBA source buffer and back out of the
    // RGBA target: one conversion each way, no copy of the picture between.
    const uint32_t pixels =
        static_cast<uint32_t>(format) == VC_FORMAT_BGRA ? VC_FORMAT_BGRA : VC_FORMAT_RGBA;
    return drawThrough(*wrapInput(input, width, height, pixels), output, pixels);
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
    ImageHandle nv21 = owned(nullptr);
    if (w == width && h == height) {
        nv21 = wrapInput(input, width, height, VC_FORMAT_NV21);
    } else if (width > 0 && height > 0) {
        nv21 = owned(VCImage_createNew(w, h, VC_FORMAT_NV21));
        if (nv21 != nullptr) {
            for (int row = 0; row < height; ++row)
                memcpy(nv21->data + static_cast<size_t>(row) * w,
                       input + static_cast<size_t>(row) * width, width);
            // The chroma block is taken as is, without re-striding: right for
            // even widths (odd height only), approximate otherwise.
            memcpy(nv21->data + static_cast<size_t>(w) * h,
                   input + static_cast<size_t>(width) * height, static_cast<size_t>(w) * h / 2);
        }
    }
    if (nv21 == nullptr) return VC_REPORT(VC_ERROR_INVALID_STATE);
    return drawThrough(*nv21, output, VC_FORMAT_RGBA);
}

int VFilterBufferedProcessorImpl::drawThrough(const VCImage& input, unsigned char* output,
                                              uint32_t outputFormat) {
    if (bindGLEnvironment() != 0) return VC_REPORT(VC_ERROR_INVALID_STATE);
    // Declared first, so undone last: after the images are released.
    struct Unbind {
        VFilterBufferedProcessorImpl* self;
        ~Unbind() { self->unbindGLEnvironment(); }
    } unbind{this};

    const int w = input.width, h = input.height;
    CallImage target = new (std::nothrow)
        EglImage(mEglEnv, EglImage::IMAGE_EXTERNAL_FRAMEBUFFER, w, h, VC_FORMAT_RGBA);
    if (target == nullptr) return VC_REPORT(VC_ERROR_INVALID_STATE);
    target->initialize();
    // The source takes RGBA as it is, BGRA converted on its way in, and YUV
    // in the platform's own format.
    uint32_t textureFormat = input.format == VC_FORMAT_BGRA ? VC_FORMAT_RGBA : input.format;
    if (VCImage_isYUV(input.format) && !Platform::isNativeInputFormat(input.format)) {
        textureFormat = Platform::getPreferredInputFormat(true);
        EglLog(VF_LOG_ERROR,
               "Input format '%4.4s' is not a native format for EglImage: Conversion required to "
               "%4.4s",
               reinterpret_cast<const char*>(&input.format),
               reinterpret_cast<const char*>(&textureFormat));
    }
    CallImage source = new (std::nothrow)
        EglImage(mEglEnv, EglImage::IMAGE_EXTERNAL, w, h, static_cast<int>(textureFormat));
    glActiveTexture(GL_TEXTURE0);
    if (source == nullptr || source->initialize() != 0 || source->bindTexture() != 0 ||
        source->setImageData(input, GL_CLAMP_TO_EDGE) != 0 || target->bindFrameBuffer() != 0) {
        return 0;  // logged where it failed
    }
    // What the effect leaves undrawn is opaque black, in the target itself;
    // the program's own opaque quad leaves nothing undrawn (a clear would
    // cost a pass over the whole target for nothing).
    if (!mProgram->getDrawFlag()) {
        glClearColor(0, 0, 0, 1);
        glClear(GL_COLOR_BUFFER_BIT);
    }
    mProgram->setCameraGeometry(w, h, 0, 0);
    mProgram->setPreviewGeometry(w, h, false);
    const KivFilter* effect = mProgram->getFilter();
    if (mProgram->onDrawFrame() != 0 && effect != nullptr && mProgram->getFilter() == nullptr) {
        // The effect failed to draw and the program dropped it for its
        // pass-through: one frame is all there is here, so draw that one.
        mProgram->onDrawFrame();
    }
    glFinish();
    // One texel read forces the draw to complete before the buffer is read.
    uint32_t texel = 0;
    glReadPixels(0, 0, 1, 1, GL_RGBA, GL_UNSIGNED_BYTE, &texel);
    EglLog(VF_LOG_DEBUG, "EGL: Synchronously waiting for rendering...");
    target->unbindFrameBuffer();
    source->unbindTexture();

    // Straight out of the locked target into the caller's memory.
    ImageHandle pixels = owned(target->getImageData());
    if (pixels == nullptr) {
        EglLog(VF_LOG_ERROR, "EGL: Can't access this FBO's pixels");
        VC_REPORT(VC_ERROR_UNKNOWN);
        return 0;
    }
    ImageHandle out = owned(VCImage_createWrap(
        output, pixels->width, pixels->height, outputFormat,
        (int)VCImage_requiredSize(pixels->width, pixels->height, outputFormat), 0));
    if (VCImage_convert(pixels.get(), out.get()) != 0) VC_REPORT(VC_ERROR_UNKNOWN);
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
