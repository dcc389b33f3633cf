// libjnigraphics on a Linux host, over the stand-in android.graphics.Bitmap:
// fields mWidth, mHeight, mConfig (an enum with nativeFormat and
// bytesPerPixel), mBuffer (a direct ByteBuffer) and mLockCount.
#include <android/bitmap.h>

namespace {

struct BitmapFields {
    jfieldID width;
    jfieldID height;
    jfieldID config;
    jfieldID buffer;
    jfieldID lockCount;
    jfieldID nativeFormat;
    jfieldID bytesPerPixel;
};

// Field ids of the stand-in class; false (with any Java exception cleared)
// when the object is not such a bitmap.
bool lookUp(JNIEnv* env, jobject bitmap, BitmapFields* f) {
    if (env == nullptr || bitmap == nullptr) return false;
    jclass bitmapClass = env->FindClass("android/graphics/Bitmap");
    if (bitmapClass == nullptr) {
        env->ExceptionClear();
        return false;
    }
    bool ok = env->IsInstanceOf(bitmap, bitmapClass);
    jclass configClass = ok ? env->FindClass("android/graphics/Bitmap$Config") : nullptr;
    if (ok && configClass != nullptr) {
        f->width = env->GetFieldID(bitmapClass, "mWidth", "I");
        f->height = env->GetFieldID(bitmapClass, "mHeight", "I");
        f->config = env->GetFieldID(bitmapClass, "mConfig", "Landroid/graphics/Bitmap$Config;");
        f->buffer = env->GetFieldID(bitmapClass, "mBuffer", "Ljava/nio/ByteBuffer;");
        f->lockCount = env->GetFieldID(bitmapClass, "mLockCount", "I");
        f->nativeFormat = env->GetFieldID(configClass, "nativeFormat", "I");
        f->bytesPerPixel = env->GetFieldID(configClass, "bytesPerPixel", "I");
        ok = f->width && f->height && f->config && f->buffer && f->lockCount && f->nativeFormat &&
             f->bytesPerPixel;
    } else {
        ok = false;
    }
    if (env->ExceptionCheck()) {
        env->ExceptionClear();
        ok = false;
    }
    if (configClass != nullptr) env->DeleteLocalRef(configClass);
    env->DeleteLocalRef(bitmapClass);
    return ok;
}

}  // namespace

extern "C" int AndroidBitmap_getInfo(JNIEnv* env, jobject jbitmap, AndroidBitmapInfo* info) {
    BitmapFields f;
    if (info == nullptr || !lookUp(env, jbitmap, &f)) return ANDROID_BITMAP_RESULT_BAD_PARAMETER;
    jobject config = env->GetObjectField(jbitmap, f.config);
    if (config == nullptr) return ANDROID_BITMAP_RESULT_BAD_PARAMETER;
    int width = env->GetIntField(jbitmap, f.width);
    int height = env->GetIntField(jbitmap, f.height);
    info->width = static_cast<uint32_t>(width);
    info->height = static_cast<uint32_t>(height);
    info->stride = static_cast<uint32_t>(width * env->GetIntField(config, f.bytesPerPixel));
    info->format = env->GetIntField(config, f.nativeFormat);
    info->flags = 0;
    env->DeleteLocalRef(config);
    return ANDROID_BITMAP_RESULT_SUCCESS;
}

extern "C" int AndroidBitmap_lockPixels(JNIEnv* env, jobject jbitmap, void** addrPtr) {
    BitmapFields f;
    if (!lookUp(env, jbitmap, &f)) return ANDROID_BITMAP_RESULT_BAD_PARAMETER;
    jobject buffer = env->GetObjectField(jbitmap, f.buffer);
    if (buffer == nullptr) return ANDROID_BITMAP_RESULT_ALLOCATION_FAILED;
    void* pixels = env->GetDirectBufferAddress(buffer);
    env->DeleteLocalRef(buffer);
    if (pixels == nullptr) return ANDROID_BITMAP_RESULT_ALLOCATION_FAILED;
    env->SetIntField(jbitmap, f.lockCount, env->GetIntField(jbitmap, f.lockCount) + 1);
    if (addrPtr != nullptr) *addrPtr = pixels;
    return ANDROID_BITMAP_RESULT_SUCCESS;
}

extern "C" int AndroidBitmap_unlockPixels(JNIEnv* env, jobject jbitmap) {
    BitmapFields f;
    if (!lookUp(env, jbitmap, &f)) return ANDROID_BITMAP_RESULT_BAD_PARAMETER;
    int count = env->GetIntField(jbitmap, f.lockCount);
    // Unlocking what was never locked is a caller bug worth reporting.
    if (count <= 0) return ANDROID_BITMAP_RESULT_BAD_PARAMETER;
    env->SetIntField(jbitmap, f.lockCount, count - 1);
    return ANDROID_BITMAP_RESULT_SUCCESS;
}
