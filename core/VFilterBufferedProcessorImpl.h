// The buffered processor: an EGL context on a 1x1 pbuffer, the current effect,
// and one synchronous draw per call. Each call builds the GL program with the
// current effect, draws into a buffer-backed framebuffer, reads the result
// back and tears the program down again, so nothing but the context survives
// between calls and a setEffect between calls needs no further step.
//
// Native clients that work on raw pixel buffers call doProcessRGBA and
// doProcessNV21 directly (VFilterBufferedProcessor::create() returns this
// class). All calls on the thread that called initialize().
#ifndef KIV_CORE_VFILTERBUFFEREDPROCESSORIMPL_H
#define KIV_CORE_VFILTERBUFFEREDPROCESSORIMPL_H

#include <pthread.h>
#include <stdint.h>
#include <utils/StrongPointer.h>

#include <functional>

#include "vccore/vc_image.h"
#include "vccore/vc_picture.h"
#include "vccore/vc_stream.h"

#include "core/VFilterBufferedProcessor.h"

class EglEnvironment;
class EglWindowSurface;
class EglProgram;
class KivBuiltInFilterCatalog;
class KivFilter;
class KivDecodeAhead;

// The thread that owns GL work of the current pipeline (shared with the live
// render manager); 0 when none.
extern pthread_t gOpenGLManagerThread;

class VFilterBufferedProcessorImpl : public VFilterBufferedProcessor {
public:
    // Records the calling thread in gOpenGLManagerThread; no GL work.
    VFilterBufferedProcessorImpl();
    // Clears gOpenGLManagerThread; frees nothing on the GPU (release() first).
    ~VFilterBufferedProcessorImpl() override;

    int release() override;
    int initialize() override;
    int setEffect(int id) override;
    int setEffect(const char* name) override;
    int setEffectParameter(const char* parameter) override;
    jintArray processBuffer(JNIEnv* env, jintArray input, int width, int height) override;
    jobject processBitmap(JNIEnv* env, jobject bitmap) override;
    void processFile(JNIEnv* env, jstring inputPath, jstring outputPath) override;
    jobject processImage(JNIEnv* env, jobject jpegBuffer, int size) override;

    // Runs the current effect over width x height pixels of `input` in
    // `format` (VC_FORMAT_BGRA, anything else is taken as VC_FORMAT_RGBA) and
    // writes the same format to `output` (width * height * 4 bytes).
    // -3 for a null buffer, -7 when the context or the program or the target
    // cannot be made; 0 otherwise, also when the draw or the read-back failed
    // (logged; the output is then left untouched).
    int doProcessRGBA(const unsigned char* input, int width, int height, unsigned char* output,
                      int format);
    // Runs the current effect over an NV21 picture and writes RGBA. Odd sizes
    // are rounded up to even: `output` must hold (w+1 if odd) x (h+1 if odd) x 4
    // bytes, and for odd sizes `input` must hold width*height luma bytes
    // followed by a chroma block of paddedWidth*paddedHeight/2 bytes (copied
    // as one block, so its layout is right only for even widths).
    // Status codes as doProcessRGBA.
    int doProcessNV21(const unsigned char* input, int width, int height, unsigned char* output);

    // Where processFile stopped; each failure but the last is a Java exception.
    enum FileStatus {
        FILE_OK = 0,
        FILE_LOAD_FAILED,     // the input could not be read or decoded as NV21
        FILE_ALLOC_FAILED,    // no memory for the RGBA result
        FILE_PROCESS_FAILED,  // doProcessNV21 returned a negative status
        FILE_NO_OUTPUT_PATH,  // outputPath() gave null
        FILE_SAVE_FAILED,     // the JPEG could not be written (not reported to Java)
    };
    // processFile without Java: loads `inputPath` as NV21, runs the current
    // effect with doProcessNV21 into a new RGBA image and saves it as a
    // quality-98 JPEG at the path that `outputPath` returns. That path is asked
    // for only once the picture is processed, and must stay valid until this
    // returns.
    FileStatus processFilePath(const char* inputPath,
                               const std::function<const char*()>& outputPath);

    // What processStream encodes: a JPEG at `quality`, or a straight-alpha PNG.
    struct StreamOutput {
        bool png;
        int quality;
        // When set, the stream goes to it as it is made (from another
        // thread) and nothing is returned through `stream`.
        VCStreamSink sink = nullptr;
        void* sinkUser = nullptr;
    };
    // Runs the current effect over a JPEG or PNG picture held in memory and
    // encodes the result, a band of rows at a time on three threads
    // (KivBandPipeline), so that memory stays small whatever the picture's
    // size. The stream is byte for byte the whole-picture path's: the
    // picture decoded to RGBA, drawn by doProcessRGBA and encoded (or, with
    // `throughNv21`, decoded to NV21 and drawn by doProcessNV21 as
    // processFile does). 0 with the malloc'ed stream; VC_ERROR_UNSUPPORTED
    // when this picture cannot stream here (larger than a texture, odd sizes
    // through NV21, no GPU memory the CPU reaches), with nothing done, so the
    // whole-picture path serves; VC_ERROR_CODEC_FAILED when it does not
    // decode (*why says why) or encode; -7 when the context or the program
    // cannot be made.
    // `ahead`, when given, is these bytes already decoding: an RGBA picture
    // takes its rows from it (the caller owns it; whatever is not taken over
    // stops when it is destroyed).
    int processStream(const unsigned char* bytes, size_t length, bool throughNv21,
                      const StreamOutput& output, unsigned char** stream, size_t* streamLength,
                      VCDecodeFailure* why, KivDecodeAhead* ahead = nullptr);
    // The same for a picture whose bytes come from a source as it decodes
    // (VCStreamReader_openSource), so that the file is never whole in memory
    // either: `reader` (taken over, its header not read yet) or, instead,
    // `ahead` already decoding it. A picture that cannot stream here has had
    // its header read: the whole-picture path opens the bytes anew.
    int processStream(VCStreamReader* reader, bool throughNv21, const StreamOutput& output,
                      unsigned char** stream, size_t* streamLength, VCDecodeFailure* why,
                      KivDecodeAhead* ahead = nullptr);

    // Makes the context current and builds the program with the current effect
    // (and, on msm8974, enables 8K textures). 0 or -7.
    int bindGLEnvironment();
    // Undoes bindGLEnvironment(): releases the program and the shader
    // compiler and makes no context current. 0.
    int unbindGLEnvironment();

    // The effect selected now (owned), or null before the first setEffect.
    KivFilter* getEffect() const { return mFilter; }

    VFilterBufferedProcessorImpl(const VFilterBufferedProcessorImpl&) = delete;
    VFilterBufferedProcessorImpl& operator=(const VFilterBufferedProcessorImpl&) = delete;

private:
    // One call: binds the environment, writes `input` into a buffer-backed
    // source texture, draws the effect into a buffer-backed target of the
    // input's size and converts the target into `output` in `outputFormat`.
    // Everything is released (and the environment unbound) on the way out.
    int drawThrough(const VCImage& input, unsigned char* output, uint32_t outputFormat);
    // processFilePath band by band (processStream through NV21) when the
    // picture and the output path allow it: true with *status set, false
    // with nothing done but, perhaps, the output path asked for.
    bool processFileStreamed(const char* inputPath, const std::function<const char*()>& output,
                             FileStatus* status);
    int initializeGL();
    int releaseFromGL();
    void deleteEffect();

    android::sp<EglEnvironment> mEglEnv;
    android::sp<EglWindowSurface> mSurface;
    android::sp<EglProgram> mProgram;
    android::sp<KivBuiltInFilterCatalog> mCatalog;
    KivFilter* mFilter;
    int32_t mMaxTextureSize;
};

#endif
