// The buffered processor's streamed path for pictures held as files: the
// same effect and the same bytes as the whole-picture path, a band at a time.
#include <GLES2/gl2.h>
#include <GLES2/gl2ext.h>
#include <stdint.h>

#include <memory>

#include "core/KivBandPipeline.h"
#include "core/KivDecodeAhead.h"
#include "core/KivFilter.h"
#include "core/KivPixelReach.h"
#include "core/VFilterBufferedProcessorImpl.h"
#include "core/egl/EglCheck.h"
#include "core/egl/EglEnvironment.h"
#include "core/egl/EglExtensions.h"
#include "core/egl/EglNativeSeam.h"
#include "core/egl/EglProgram.h"
#include "core/egl/Platform.h"
#include "vccore/vc_error.h"
#include "vccore/vc_log.h"
#include "vccore/vc_stream.h"

#define VC_SOURCE "core/VFilterBufferedProcessorStream"

namespace {

// Rows a band needs beyond its own: what the effect reads, plus the row on
// each side that linear filtering touches (with no weight) at the edges.
int haloRows(const KivPixelReach& reach, int height) {
    switch (reach.kind) {
        case KivPixelReach::SAME_PIXEL:
            return 2;
        case KivPixelReach::NEIGHBOURS:
            return reach.haloRows + 2;
        default:
            return height;
    }
}

// The GL objects of one streamed picture, made and deleted with the context
// current: the source as an external texture (an EGL image of its 2D
// texture, as the GPU sees every camera picture) and the target in a
// framebuffer.
class StreamObjects {
public:
    explicit StreamObjects(EGLDisplay display) : mDisplay(display) {}
    ~StreamObjects() {
        if (mFramebuffer != 0) {
            glBindFramebuffer(GL_FRAMEBUFFER, 0);
            glDeleteFramebuffers(1, &mFramebuffer);
        }
        if (mExternal != 0) {
            glBindTexture(GL_TEXTURE_EXTERNAL_OES, 0);
            glDeleteTextures(1, &mExternal);
        }
        if (mImage != EGL_NO_IMAGE_KHR) EglExtensions::get().eglDestroyImageKHR(mDisplay, mImage);
    }

    // The GPU's source and target pictures: the whole picture's, or a
    // tile's.
    bool make(int sourceWidth, int sourceHeight, int targetWidth, int targetHeight) {
        EglNativeSeam& seam = EglNativeSeam::get();
        source = seam.createSharedPicture(sourceWidth, sourceHeight);
        target = seam.createSharedPicture(targetWidth, targetHeight);
        return source != nullptr && target != nullptr;
    }

    // Clamped, and sampled linear as the whole picture's external image is,
    // or nearest (`nearest`) where that gives the same texels.
    bool bind(bool nearest) {
        const GLint filter = nearest ? GL_NEAREST : GL_LINEAR;
        const EglExtensions& ext = EglExtensions::get();
        glBindTexture(GL_TEXTURE_2D, source->texture());
        glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MIN_FILTER, filter);
        glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MAG_FILTER, filter);
        glBindTexture(GL_TEXTURE_2D, 0);
        const EGLint attribs[] = {EGL_GL_TEXTURE_LEVEL_KHR, 0, EGL_IMAGE_PRESERVED_KHR, EGL_TRUE,
                                  EGL_NONE};
        mImage = ext.eglCreateImageKHR(mDisplay, eglGetCurrentContext(), EGL_GL_TEXTURE_2D_KHR,
                                       (EGLClientBuffer)(uintptr_t)source->texture(), attribs);
        if (mImage == EGL_NO_IMAGE_KHR) return false;
        glGenTextures(1, &mExternal);
        glActiveTexture(GL_TEXTURE0);
        glBindTexture(GL_TEXTURE_EXTERNAL_OES, mExternal);
        glTexParameteri(GL_TEXTURE_EXTERNAL_OES, GL_TEXTURE_MIN_FILTER, filter);
        glTexParameteri(GL_TEXTURE_EXTERNAL_OES, GL_TEXTURE_MAG_FILTER, filter);
        glTexParameteri(GL_TEXTURE_EXTERNAL_OES, GL_TEXTURE_WRAP_S, GL_CLAMP_TO_EDGE);
        glTexParameteri(GL_TEXTURE_EXTERNAL_OES, GL_TEXTURE_WRAP_T, GL_CLAMP_TO_EDGE);
        ext.glEGLImageTargetTexture2DOES(GL_TEXTURE_EXTERNAL_OES, (GLeglImageOES)mImage);
        glGenFramebuffers(1, &mFramebuffer);
        glBindFramebuffer(GL_FRAMEBUFFER, mFramebuffer);
        glFramebufferTexture2D(GL_FRAMEBUFFER, GL_COLOR_ATTACHMENT0, GL_TEXTURE_2D,
                               target->texture(), 0);
        return glCheckFramebufferStatus(GL_FRAMEBUFFER) == GL_FRAMEBUFFER_COMPLETE &&
               glGetError() == GL_NO_ERROR;
    }

    // Declared first, so deleted last, after what is made over them.
    std::unique_ptr<EglSharedPicture> source;
    std::unique_ptr<EglSharedPicture> target;

private:
    EGLDisplay mDisplay;
    EGLImageKHR mImage = EGL_NO_IMAGE_KHR;
    GLuint mExternal = 0;
    GLuint mFramebuffer = 0;
};

// Columns beyond a tile's own that its pixels read, as haloRows() for rows.
int haloColumns(const KivPixelReach& reach) {
    return reach.kind == KivPixelReach::NEIGHBOURS ? reach.haloColumns + 2 : 2;
}

// Says why a picture takes the whole-picture path.
int unstreamable(const char* why) {
    EglLog(VF_LOG_DEBUG, "EGL: picture not streamed: %s", why);
    return VC_ERROR_UNSUPPORTED;
}

struct ReaderCloser {
    void operator()(VCStreamReader* r) const { VCStreamReader_close(r); }
};
struct WriterCloser {
    void operator()(VCStreamWriter* w) const { VCStreamWriter_close(w); }
};

}  // namespace

int VFilterBufferedProcessorImpl::processStream(const unsigned char* bytes, size_t length,
                                                bool throughNv21, const StreamOutput& output,
                                                unsigned char** stream, size_t* streamLength,
                                                VCDecodeFailure* why, KivDecodeAhead* ahead) {
    if (bytes == nullptr || stream == nullptr || streamLength == nullptr || why == nullptr)
        return VC_ERROR_NULL_PARAM;
    if (ahead != nullptr && (throughNv21 || !ahead->ok() || ahead->bytes() != bytes))
        ahead = nullptr;
    return processStream(ahead == nullptr ? VCStreamReader_open(bytes, length) : nullptr,
                         throughNv21, output, stream, streamLength, why, ahead);
}

int VFilterBufferedProcessorImpl::processStream(VCStreamReader* opened, bool throughNv21,
                                                const StreamOutput& output,
                                                unsigned char** stream, size_t* streamLength,
                                                VCDecodeFailure* why, KivDecodeAhead* ahead) {
    std::unique_ptr<VCStreamReader, ReaderCloser> reader(opened);
    if (stream == nullptr || streamLength == nullptr || why == nullptr) return VC_ERROR_NULL_PARAM;
    *why = VC_DECODE_OK;
    // Where the platform's fast codec is installed, JPEG goes through it.
    if (VCStream_fastJpegCodecInstalled()) return unstreamable("the fast JPEG codec is installed");
    if (ahead != nullptr && (throughNv21 || !ahead->ok())) ahead = nullptr;
    if (ahead != nullptr) reader.reset();
    int width = ahead != nullptr ? ahead->width() : 0;
    int height = ahead != nullptr ? ahead->height() : 0;
    if (ahead == nullptr &&
        (reader == nullptr || VCStreamReader_readHeader(reader.get(), &width, &height) != 0)) {
        *why = reader == nullptr ? VC_DECODE_NOT_A_PICTURE : VCStreamReader_failure(reader.get());
        return VC_ERROR_CODEC_FAILED;
    }
    // NV21 pads odd sizes, which the whole-picture path does its own way.
    if (throughNv21 && ((width | height) & 1) != 0) return unstreamable("odd size through NV21");

    if (mFilter == nullptr) return unstreamable("no effect");
    if (bindGLEnvironment() != 0) return VC_REPORT(VC_ERROR_INVALID_STATE);
    struct Unbind {
        VFilterBufferedProcessorImpl* self;
        ~Unbind() { self->unbindGLEnvironment(); }
    } unbind{this};
    // Effects that do not say what they read (downloadable ones) may do
    // anything with the picture; one that draws by itself in several passes
    // reads rows its band's passes did not draw.
    const KivPixelReach reach = KivFilter_pixelReach(mFilter, width, height);
    if (dynamic_cast<const KivPixelReachSource*>(mFilter) == nullptr)
        return unstreamable("the effect does not say which pixels it reads");
    if (!mProgram->getDrawFlag() && reach.kind != KivPixelReach::SAME_PIXEL)
        return unstreamable("the effect draws neighbour-reading passes by itself");
    const int halo = haloRows(reach, height);
    // Larger than a texture: tiles, each with the rows and columns it reads
    // around it, for effects whose reach leaves room in a texture.
    const int maxSize = Platform::getMaximumTextureSize();
    const bool tiled = width > maxSize || height > maxSize;
    KivBandPipeline::Picture picture = {width, height, halo, throughNv21, 0};
    KivBandPipeline::Tiles tiles = {nullptr, nullptr, 0, 0, 0};
    if (tiled) {
        if (reach.kind == KivPixelReach::WHOLE_PICTURE)
            return unstreamable("larger than a texture");
        // A side larger than a texture is read in parts of a power-of-two
        // size (see KivBandPipeline::drawTiles); a side that fits, whole.
        int part = 1;
        while (part * 2 <= maxSize) part *= 2;
        tiles.haloColumns = haloColumns(reach);
        picture.bandRows = KivBandPipeline::bandRows(width);
        if (height > maxSize) picture.bandRows = std::min(picture.bandRows, part - 2 * halo);
        if (picture.bandRows < 1 || (width > maxSize && part - 2 * tiles.haloColumns < 1))
            return unstreamable("the effect reads too far for tiles of a texture");
        tiles.sourceWidth = width > maxSize ? part : width;
        tiles.sourceRows = height;
        if (height > maxSize) {
            tiles.sourceRows = 1;
            while (tiles.sourceRows < picture.bandRows + 2 * halo) tiles.sourceRows *= 2;
        }
    }
    const int tileWidth = width <= maxSize ? width : tiles.sourceWidth - 2 * tiles.haloColumns;
    StreamObjects gl(mEglEnv->getEGLDisplay());
    KivRowStore sourceRows, targetRows;
    if (tiled ? !gl.make(tiles.sourceWidth, tiles.sourceRows, tileWidth, picture.bandRows)
              : !gl.make(width, height, width, height))
        return unstreamable("no GPU memory the CPU reaches");
    if (tiled && (!sourceRows.make(width, height) || !targetRows.make(width, height))) {
        EglLog(VF_LOG_ERROR, "EGL: no memory for the rows of a %dx%d picture", width, height);
        return VC_REPORT(VC_ERROR_ALLOC_FAILED);
    }
    // A pixel that reads only its own texel samples it at the texel's
    // centre, where the host's linear filter (fixed-point weights) gives the
    // texel itself: nearest gives the same bytes and takes about a fifth off
    // the draw. Effects that read elsewhere keep the linear filter.
    if (!gl.bind(reach.kind == KivPixelReach::SAME_PIXEL)) {
        EglLog(VF_LOG_ERROR, "EGL: cannot stream a %dx%d picture through GL", width, height);
        return VC_REPORT(VC_ERROR_INVALID_STATE);
    }
    std::unique_ptr<VCStreamWriter, WriterCloser> writer(
        output.png ? VCStreamWriter_openPng(width, height)
                   : VCStreamWriter_openJpeg(width, height, output.quality));
    if (writer == nullptr) return VC_REPORT(VC_ERROR_ALLOC_FAILED);
    if (output.sink != nullptr) VCStreamWriter_setSink(writer.get(), output.sink, output.sinkUser);

    // The whole picture's trace, as its draw would leave it.
    EglLog(VF_LOG_DEBUG, "%s",
           throughNv21 ? "int VFilterBufferedProcessorImpl::doProcessNV21(const unsigned char*, "
                         "int, int, unsigned char*)"
                       : "int VFilterBufferedProcessorImpl::doProcessRGBA(const unsigned char*, "
                         "int, int, unsigned char*, int)");
    if (throughNv21 && !Platform::isNativeInputFormat(VC_FORMAT_NV21)) {
        const uint32_t nv21 = VC_FORMAT_NV21, preferred = Platform::getPreferredInputFormat(true);
        EglLog(VF_LOG_ERROR,
               "Input format '%4.4s' is not a native format for EglImage: Conversion required to "
               "%4.4s",
               reinterpret_cast<const char*>(&nv21), reinterpret_cast<const char*>(&preferred));
    }
    mProgram->setCameraGeometry(width, height, 0, 0);
    mProgram->setPreviewGeometry(width, height, false);
    int rc;
    if (tiled) {
        tiles.source = gl.source.get();
        tiles.target = gl.target.get();
        KivBandPipeline pipeline(*mProgram, sourceRows, targetRows, picture, &tiles);
        rc = ahead != nullptr ? pipeline.run(ahead, writer.get())
                              : pipeline.run(reader.get(), writer.get());
        // The next picture is drawn whole again.
        mProgram->setWindow(nullptr);
    } else {
        KivBandPipeline pipeline(*mProgram, *gl.source, *gl.target, picture);
        rc = ahead != nullptr ? pipeline.run(ahead, writer.get())
                              : pipeline.run(reader.get(), writer.get());
    }
    if (rc != 0) {
        *why = ahead != nullptr ? ahead->failure() : VCStreamReader_failure(reader.get());
        return rc;
    }
    EglLog(VF_LOG_DEBUG, "EGL: Synchronously waiting for rendering...");
    *stream = nullptr;
    *streamLength = 0;
    if (output.sink != nullptr) return VCStreamWriter_end(writer.release());
    *stream = VCStreamWriter_finish(writer.release(), streamLength);
    return *stream != nullptr ? 0 : VC_ERROR_CODEC_FAILED;
}
