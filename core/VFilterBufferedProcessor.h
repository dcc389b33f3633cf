// Offline processor: applies one effect to one still image at a time,
// synchronously, on the calling thread (which must be the thread that called
// initialize(), since EGL binds the context to it).
//
// Calling order: BufferedProcessor_Create -> initialize() -> setEffect(...)
// -> optionally setEffectParameter(...) -> any number of process calls (with
// setEffect/setEffectParameter in between as wanted) -> release() ->
// BufferedProcessor_Destroy. Destruction frees nothing on the GPU: call
// release() first.
//
// The virtual operations are in a fixed order (the JNI layer and native
// clients call through this table); new operations go into the implementation.
#ifndef KIV_CORE_VFILTERBUFFEREDPROCESSOR_H
#define KIV_CORE_VFILTERBUFFEREDPROCESSOR_H

#include <jni.h>

class VFilterBufferedProcessor {
public:
    virtual ~VFilterBufferedProcessor() {}

    // Deletes the effect and tears down the EGL context. Always 0.
    virtual int release() = 0;
    // Creates the EGL context and its 1x1 pbuffer. Always 0 (failures are logged
    // and show up as -7 from the process calls).
    virtual int initialize() = 0;
    // Selects an effect by id; an unknown id installs the pass-through effect
    // 400. Always 0.
    virtual int setEffect(int id) = 0;
    // Selects an effect by name: a built-in filter-library name, else a
    // downloadable filter of that name, else effect 400. Always 0.
    virtual int setEffect(const char* name) = 0;
    // Hands a "name=value,..." string to the effect's "parameter" option.
    // Always 0.
    virtual int setEffectParameter(const char* parameter) = 0;

    // Processes Java ARGB int pixels (width x height); returns a new int[] of
    // the input's length, or null with a pending Java exception.
    virtual jintArray processBuffer(JNIEnv* env, jintArray input, int width, int height) = 0;
    // Processes an android.graphics.Bitmap (treated as RGBA_8888); returns a
    // new ARGB_8888 Bitmap, or null.
    virtual jobject processBitmap(JNIEnv* env, jobject bitmap) = 0;
    // Processes a JPEG file into a JPEG file (quality 98).
    virtual void processFile(JNIEnv* env, jstring inputPath, jstring outputPath) = 0;
    // Processes size bytes of JPEG in a direct ByteBuffer; returns a direct
    // ByteBuffer over the processed JPEG (its memory is never freed by the
    // library), or null.
    virtual jobject processImage(JNIEnv* env, jobject jpegBuffer, int size) = 0;

    // A new VFilterBufferedProcessorImpl.
    static VFilterBufferedProcessor* create();
};

extern "C" {
// Logs "EGL: BufferedProcessor_Create" and returns a new, uninitialised
// processor.
VFilterBufferedProcessor* BufferedProcessor_Create();
// Deletes the processor (null: nothing). Does not call release().
void BufferedProcessor_Destroy(VFilterBufferedProcessor* processor);
// Version of this interface: 3.
int BufferedProcessor_GetVersion();
}

#endif
