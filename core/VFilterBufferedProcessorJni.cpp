// The Java-facing operations of the buffered processor: Java arrays, bitmaps,
// files and direct buffers are turned into pixel buffers for doProcessRGBA
// and doProcessNV21, and failures into Java exceptions.
#include <android/bitmap.h>
#include <stdlib.h>
#include <string.h>

#include <vector>

#include "core/VFilterBufferedProcessorImpl.h"
#include "core/egl/EglCheck.h"
#include "vccore/vc_file.h"
#include "vccore/vc_image.h"
#include "vccore/vc_log.h"

namespace {

// Encoded pictures are written at this quality whatever the input's was.
const int kJpegQuality = 98;

void throwJava(JNIEnv* env, const char* className, const char* message) {
    jclass c = env->FindClass(className);
    if (c == nullptr) return;  // FindClass left its own exception pending
    env->ThrowNew(c, message);
    env->DeleteLocalRef(c);
}

void throwNpe(JNIEnv* env, const char* message) {
    throwJava(env, "java/lang/NullPointerException", message);
}

void throwRuntime(JNIEnv* env, const char* message) {
    throwJava(env, "java/lang/RuntimeException", message);
}

}  // namespace

jintArray VFilterBufferedProcessorImpl::processBuffer(JNIEnv* env, jintArray input, int width,
                                                      int height) {
    EglLog(VF_LOG_DEBUG, "%s",
           "virtual _jintArray* VFilterBufferedProcessorImpl::processBuffer(JNIEnv*, jintArray, "
           "int, int)");
    if (input == nullptr) {
        throwNpe(env, "native_process_buffer: jinputbuffer is null");
        return nullptr;
    }
    jsize length = env->GetArrayLength(input);
    jint* elements = env->GetIntArrayElements(input, nullptr);
    jintArray result = env->NewIntArray(length);
    // Zeroed: a call whose read-back fails still returns 0, and its result
    // must not carry leftover heap contents into Java.
    unsigned char* scratch =
        static_cast<unsigned char*>(calloc(VCImage_requiredSize(width, height, VC_FORMAT_BGRA), 1));
    if (elements == nullptr || result == nullptr || scratch == nullptr) {
        // The JVM has an OutOfMemoryError pending for the failed one.
        if (elements != nullptr) env->ReleaseIntArrayElements(input, elements, 0);
        free(scratch);
        if (!env->ExceptionCheck()) throwRuntime(env, "native_process_buffer failed");
        return nullptr;
    }
    // Java ARGB ints are B, G, R, A in memory on a little-endian machine. An
    // array shorter than the picture would be read past its end: refused.
    int status = static_cast<int64_t>(length) * 4 <
                         static_cast<int64_t>(VCImage_requiredSize(width, height, VC_FORMAT_BGRA))
                     ? VC_ERROR_INVALID_PARAM
                     : doProcessRGBA(reinterpret_cast<const unsigned char*>(elements), width,
                                     height, scratch, static_cast<int>(VC_FORMAT_BGRA));
    if (status < 0) {
        env->ReleaseIntArrayElements(input, elements, 0);
        free(scratch);
        throwRuntime(env, "native_process_buffer failed");
        return nullptr;
    }
    // Only as many pixels as both the array and the picture hold.
    jsize pixels = static_cast<jsize>(VCImage_requiredSize(width, height, VC_FORMAT_BGRA) / 4);
    env->SetIntArrayRegion(result, 0, length < pixels ? length : pixels,
                           reinterpret_cast<const jint*>(scratch));
    free(scratch);
    env->ReleaseIntArrayElements(input, elements, 0);
    return result;
}

jobject VFilterBufferedProcessorImpl::processBitmap(JNIEnv* env, jobject bitmap) {
    EglLog(VF_LOG_DEBUG, "%s",
           "virtual _jobject* VFilterBufferedProcessorImpl::processBitmap(JNIEnv*, jobject)");
    if (bitmap == nullptr) {
        throwNpe(env, "native_process_bitmap: jinputbitmap is null");
        return nullptr;
    }
    AndroidBitmapInfo info;
    if (AndroidBitmap_getInfo(env, bitmap, &info) < 0) {
        EglLog(VF_LOG_ERROR, "AndroidBitmap_getInfo() failed!");
        return nullptr;
    }
    EglLog(VF_LOG_DEBUG, "process_bitmap: width:%d, height:%d, stride:%d", info.width, info.height,
           info.stride);
    // Other formats are processed all the same, as 4-byte pixels of width x 4
    // bytes per row.
    if (info.format != ANDROID_BITMAP_FORMAT_RGBA_8888) {
        EglLog(VF_LOG_ERROR, "Bitmap format is not RGBA_8888!");
    }
    const int width = static_cast<int>(info.width);
    const int height = static_cast<int>(info.height);
    void* pixels = nullptr;
    if (AndroidBitmap_lockPixels(env, bitmap, &pixels) < 0) {
        EglLog(VF_LOG_ERROR, "AndroidBitmap_lockPixels(jinputbitmap) failed!");
        return nullptr;
    }
    const size_t bytes = VCImage_requiredSize(width, height, VC_FORMAT_RGBA);
    unsigned char* scratch = static_cast<unsigned char*>(calloc(bytes, 1));  // zeroed, as above
    int status = scratch == nullptr
                     ? VC_ERROR_ALLOC_FAILED
                     : doProcessRGBA(static_cast<const unsigned char*>(pixels), width, height,
                                     scratch, static_cast<int>(VC_FORMAT_RGBA));
    AndroidBitmap_unlockPixels(env, bitmap);
    if (status < 0) {
        free(scratch);
        throwRuntime(env, "native_process_bitmap failed");
        return nullptr;
    }

    jobject result = nullptr;
    jclass bitmapClass = env->FindClass("android/graphics/Bitmap");
    jclass configClass = env->FindClass("android/graphics/Bitmap$Config");
    if (bitmapClass != nullptr && configClass != nullptr) {
        jmethodID createBitmap =
            env->GetStaticMethodID(bitmapClass, "createBitmap",
                                   "(IILandroid/graphics/Bitmap$Config;)Landroid/graphics/Bitmap;");
        jmethodID valueOf = env->GetStaticMethodID(
            configClass, "valueOf", "(Ljava/lang/String;)Landroid/graphics/Bitmap$Config;");
        jstring name = env->NewStringUTF("ARGB_8888");
        jobject config = (valueOf != nullptr && name != nullptr)
                             ? env->CallStaticObjectMethod(configClass, valueOf, name)
                             : nullptr;
        if (createBitmap != nullptr && config != nullptr && !env->ExceptionCheck()) {
            result = env->CallStaticObjectMethod(bitmapClass, createBitmap, width, height, config);
        }
        if (name != nullptr) env->DeleteLocalRef(name);
        if (config != nullptr) env->DeleteLocalRef(config);
    }
    if (bitmapClass != nullptr) env->DeleteLocalRef(bitmapClass);
    if (configClass != nullptr) env->DeleteLocalRef(configClass);
    if (result == nullptr || env->ExceptionCheck()) {
        // The pending Java exception says why the bitmap could not be made.
        free(scratch);
        return nullptr;
    }

    void* resultPixels = nullptr;
    if (AndroidBitmap_lockPixels(env, result, &resultPixels) < 0) {
        EglLog(VF_LOG_ERROR, "AndroidBitmap_lockPixels(resultBitmapPixels) failed!");
        free(scratch);
        env->DeleteLocalRef(result);
        return nullptr;
    }
    memcpy(resultPixels, scratch, static_cast<size_t>(width) * height * 4);
    AndroidBitmap_unlockPixels(env, result);
    free(scratch);
    return result;
}

VFilterBufferedProcessorImpl::FileStatus VFilterBufferedProcessorImpl::processFilePath(
    const char* inputPath, const std::function<const char*()>& outputPath) {
    // The path is asked for once, whichever way the picture goes.
    bool asked = false;
    const char* out = nullptr;
    auto output = [&]() {
        if (!asked) out = outputPath();
        asked = true;
        return out;
    };
    FileStatus status = FILE_OK;
    if (inputPath != nullptr && processFileStreamed(inputPath, output, &status)) return status;

    VCImage* nv21 = VCImage_createEmpty(0, 0, VC_FORMAT_NV21);
    VCImage* rgba = nullptr;
    if (nv21 == nullptr || inputPath == nullptr || VCImage_loadFromFile(nv21, inputPath) != 0) {
        status = FILE_LOAD_FAILED;
    } else if ((rgba = VCImage_createNew(nv21->width, nv21->height, VC_FORMAT_RGBA)) == nullptr) {
        status = FILE_ALLOC_FAILED;
    } else if (doProcessNV21(nv21->data, nv21->width, nv21->height, rgba->data) < 0) {
        status = FILE_PROCESS_FAILED;
    } else if (output() == nullptr) {
        status = FILE_NO_OUTPUT_PATH;
    } else if (VCImage_saveToFile(rgba, out, kJpegQuality) != 0) {
        status = FILE_SAVE_FAILED;
    }
    if (nv21 != nullptr) VCImage_destroy(nv21);
    if (rgba != nullptr) VCImage_destroy(rgba);
    return status;
}

namespace {

// What VCImage_saveToFile makes of a path: the first of ".jpeg", ".jpg" and
// ".png" found anywhere in it, in that order, any case.
bool savesJpeg(const char* path) {
    for (const char* ext : {".jpeg", ".jpg", ".png"}) {
        if (strcasestr(path, ext) != nullptr) return strcmp(ext, ".png") != 0;
    }
    return false;
}

// The whole file, or empty when it cannot be read.
std::vector<unsigned char> readWhole(const char* path) {
    std::vector<unsigned char> bytes;
    FILE* file = fopen(path, "rb");
    if (file == nullptr) return bytes;
    long length = fsize(file);
    if (length > 0) {
        bytes.resize((size_t)length);
        if (fread(bytes.data(), 1, bytes.size(), file) != bytes.size()) bytes.clear();
    }
    fclose(file);
    return bytes;
}

}  // namespace

bool VFilterBufferedProcessorImpl::processFileStreamed(const char* inputPath,
                                                       const std::function<const char*()>& output,
                                                       FileStatus* status) {
    std::vector<unsigned char> bytes = readWhole(inputPath);
    if (bytes.empty()) return false;
    unsigned char* jpeg = nullptr;
    size_t length = 0;
    VCDecodeFailure why = VC_DECODE_OK;
    // Anything but a finished picture (a failure too) goes the whole way,
    // which fails as it always has.
    if (processStream(bytes.data(), bytes.size(), true, {false, kJpegQuality}, &jpeg, &length,
                      &why) != 0) {
        return false;
    }
    bytes = std::vector<unsigned char>();
    const char* out = output();
    if (out == nullptr) {
        *status = FILE_NO_OUTPUT_PATH;
    } else if (savesJpeg(out)) {
        save_to_file(out, jpeg, length);
        *status = FILE_OK;
    } else {
        // Another format: the picture is made again the whole way for it.
        free(jpeg);
        return false;
    }
    free(jpeg);
    return true;
}

void VFilterBufferedProcessorImpl::processFile(JNIEnv* env, jstring inputPath, jstring outputPath) {
    EglLog(VF_LOG_DEBUG, "%s",
           "virtual void VFilterBufferedProcessorImpl::processFile(JNIEnv*, jstring, jstring)");
    if (inputPath == nullptr) {
        throwNpe(env, "native_process_file: jinputfile is null");
        return;
    }
    if (outputPath == nullptr) {
        throwNpe(env, "native_process_file: joutfile is null");
        return;
    }
    const char* in = env->GetStringUTFChars(inputPath, nullptr);
    if (in == nullptr) {
        env->ExceptionClear();
        throwRuntime(env, "native_process_file: GetStringUTFChars(inputfile) failed");
        return;
    }
    // The output path is unwrapped only once there is a picture to write.
    const char* out = nullptr;
    FileStatus status = processFilePath(in, [&]() {
        out = env->GetStringUTFChars(outputPath, nullptr);
        return out;
    });
    switch (status) {
        case FILE_LOAD_FAILED:
            throwRuntime(env, "native_process_file: VCImage_decodeFromJpeg(inputfile) failed");
            break;
        case FILE_ALLOC_FAILED:
            throwRuntime(env, "native_process_file: Failed to allocate output");
            break;
        case FILE_PROCESS_FAILED:
            throwRuntime(env, "native_process_file failed");
            break;
        case FILE_NO_OUTPUT_PATH:
            env->ExceptionClear();
            throwRuntime(env, "native_process_file: GetStringUTFChars(outfile) failed");
            break;
        case FILE_OK:
        case FILE_SAVE_FAILED:  // not reported to Java
            break;
    }
    if (out != nullptr) env->ReleaseStringUTFChars(outputPath, out);
    env->ReleaseStringUTFChars(inputPath, in);
}

jobject VFilterBufferedProcessorImpl::processImage(JNIEnv* env, jobject jpegBuffer, int size) {
    EglLog(VF_LOG_DEBUG, "%s",
           "virtual _jobject* VFilterBufferedProcessorImpl::processImage(JNIEnv*, jobject, int)");
    const unsigned char* jpeg =
        jpegBuffer != nullptr
            ? static_cast<const unsigned char*>(env->GetDirectBufferAddress(jpegBuffer))
            : nullptr;
    VCImage* nv21 = VCImage_createEmpty(0, 0, VC_FORMAT_NV21);
    if (jpeg == nullptr || nv21 == nullptr || VCImage_decodeFromJpeg(nv21, jpeg, size) != 0) {
        if (nv21 != nullptr) VCImage_destroy(nv21);
        throwRuntime(env, "process_file: Failed to decode the jpeg image");
        return nullptr;
    }
    VCImage* rgba = VCImage_createNew(nv21->width, nv21->height, VC_FORMAT_RGBA);
    if (rgba == nullptr) {
        VCImage_destroy(nv21);
        throwRuntime(env, "process_file: Failed to allocate output");
        return nullptr;
    }
    if (doProcessNV21(nv21->data, nv21->width, nv21->height, rgba->data) < 0) {
        VCImage_destroy(nv21);
        VCImage_destroy(rgba);
        throwRuntime(env, "process_file failed");
        return nullptr;
    }
    VCImage* encoded = VCImage_encodeToJpeg(rgba, kJpegQuality);
    VCImage_destroy(nv21);
    VCImage_destroy(rgba);
    if (encoded == nullptr) return nullptr;

    jobject buffer = env->NewDirectByteBuffer(encoded->data, static_cast<jlong>(encoded->size));
    if (buffer == nullptr) {
        EglLog(VF_LOG_ERROR, "Couldn't allocate byte buffer for JPEG data");
        VCImage_destroy(encoded);
        env->ExceptionClear();
        return nullptr;
    }
    // The Java buffer keeps the bytes: the record lets go of them.
    encoded->wrapped = 1;
    VCImage_destroy(encoded);

    jclass orderClass = env->FindClass("java/nio/ByteOrder");
    jclass bufferClass = env->FindClass("java/nio/ByteBuffer");
    if (orderClass != nullptr && bufferClass != nullptr) {
        jmethodID nativeOrder =
            env->GetStaticMethodID(orderClass, "nativeOrder", "()Ljava/nio/ByteOrder;");
        jmethodID order =
            env->GetMethodID(bufferClass, "order", "(Ljava/nio/ByteOrder;)Ljava/nio/ByteBuffer;");
        jmethodID position = env->GetMethodID(bufferClass, "position", "(I)Ljava/nio/Buffer;");
        if (nativeOrder != nullptr && order != nullptr && position != nullptr) {
            jobject byteOrder = env->CallStaticObjectMethod(orderClass, nativeOrder);
            jobject same = env->CallObjectMethod(buffer, order, byteOrder);
            jobject again = env->CallObjectMethod(buffer, position, 0);
            if (byteOrder != nullptr) env->DeleteLocalRef(byteOrder);
            if (same != nullptr) env->DeleteLocalRef(same);
            if (again != nullptr) env->DeleteLocalRef(again);
        }
    }
    if (orderClass != nullptr) env->DeleteLocalRef(orderClass);
    if (bufferClass != nullptr) env->DeleteLocalRef(bufferClass);
    return buffer;
}
