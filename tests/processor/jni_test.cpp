// The Java-facing operations of the buffered processor inside a real JVM:
// int[] pixels, Bitmaps (host stand-in class and libjnigraphics), JPEG files
// and direct buffers, with their Java exceptions and log lines.
#include <gtest/gtest.h>

#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

#include <android/bitmap.h>

#include "core/VFilterBufferedProcessorImpl.h"
#include "support/gl_fault.h"
#include "support/jvm.h"
#include "support/log_capture.h"
#include "support/look_reference.h"
#include "vccore/vc_file.h"
#include "vccore/vc_image.h"

// The VM raises SIGSEGV on purpose (implicit null checks, safepoints); let it
// handle them itself under AddressSanitizer.
extern "C" const char* __asan_default_options() {
    return "handle_segv=0:allow_user_segv_handler=1";
}
// LeakSanitizer cannot scan the VM's threads (its tracer faults on them), so
// this suite runs without the leak check; the processor's own allocations are
// leak-checked by the suites without a VM.
extern "C" int __lsan_is_turned_off() {
    return 1;
}

namespace {

class JniProcessorTest : public ::testing::Test {
protected:
    void SetUp() override {
        mEnv = KivTestJvm_start(KIV_TEST_LIBJVM, KIV_TEST_JAVA_CLASSES);
        ASSERT_NE(nullptr, mEnv) << "no JVM from " << KIV_TEST_LIBJVM;
        mEnv->PushLocalFrame(256);
        mProcessor = static_cast<VFilterBufferedProcessorImpl*>(BufferedProcessor_Create());
        ASSERT_EQ(0, mProcessor->initialize());
        char dir[] = "/tmp/kiv_jni_XXXXXX";
        ASSERT_NE(nullptr, mkdtemp(dir));
        mDir = dir;
    }
    void TearDown() override {
        if (mProcessor != nullptr) {
            mProcessor->release();
            BufferedProcessor_Destroy(mProcessor);
        }
        if (mEnv != nullptr) mEnv->PopLocalFrame(nullptr);
        if (!mDir.empty()) {
            for (const char* f : {"/in.jpg", "/out.jpg"}) unlink((mDir + f).c_str());
            rmdir(mDir.c_str());
        }
    }

    jobject newBitmap(int width, int height, const char* config) {
        jclass bitmapClass = mEnv->FindClass("android/graphics/Bitmap");
        jclass configClass = mEnv->FindClass("android/graphics/Bitmap$Config");
        if (bitmapClass == nullptr || configClass == nullptr) return nullptr;
        jmethodID valueOf = mEnv->GetStaticMethodID(
            configClass, "valueOf", "(Ljava/lang/String;)Landroid/graphics/Bitmap$Config;");
        jmethodID create = mEnv->GetStaticMethodID(
            bitmapClass, "createBitmap",
            "(IILandroid/graphics/Bitmap$Config;)Landroid/graphics/Bitmap;");
        jobject c = mEnv->CallStaticObjectMethod(configClass, valueOf, mEnv->NewStringUTF(config));
        return mEnv->CallStaticObjectMethod(bitmapClass, create, width, height, c);
    }

    int intCall(jobject object, const char* method) {
        jclass c = mEnv->GetObjectClass(object);
        return mEnv->CallIntMethod(object, mEnv->GetMethodID(c, method, "()I"));
    }

    JNIEnv* mEnv = nullptr;
    VFilterBufferedProcessorImpl* mProcessor = nullptr;
    std::string mDir;
};

std::vector<uint8_t> fileBytes(const std::string& path) {
    std::ifstream f(path, std::ios::binary);
    return std::vector<uint8_t>(std::istreambuf_iterator<char>(f), {});
}

// The first quantisation table of a JPEG stream, sorted (order does not matter
// for telling qualities apart).
std::vector<int> firstQuantTable(const std::vector<uint8_t>& jpeg) {
    for (size_t i = 2; i + 4 + 64 < jpeg.size(); ++i) {
        if (jpeg[i] == 0xFF && jpeg[i + 1] == 0xDB) {
            if ((jpeg[i + 4] >> 4) != 0) return {};  // 16-bit tables: not expected here
            std::vector<int> q(jpeg.begin() + i + 5, jpeg.begin() + i + 5 + 64);
            std::sort(q.begin(), q.end());
            return q;
        }
    }
    return {};
}

// The libjpeg luminance table scaled for a quality, as its encoder does it.
std::vector<int> ijgLuminanceTable(int quality) {
    static const int base[64] = {16,  11,  10,  16,  24, 40, 51,  61,  12,  12,  14,  19,  26,
                                 58,  60,  55,  14,  13, 16, 24,  40,  57,  69,  56,  14,  17,
                                 22,  29,  51,  87,  80, 62, 18,  22,  37,  56,  68,  109, 103,
                                 77,  24,  35,  55,  64, 81, 104, 113, 92,  49,  64,  78,  87,
                                 103, 121, 120, 101, 72, 92, 95,  98,  112, 100, 103, 99};
    int scale = quality < 50 ? 5000 / quality : 200 - quality * 2;
    std::vector<int> q(64);
    for (int i = 0; i < 64; ++i) q[i] = std::min(std::max((base[i] * scale + 50) / 100, 1), 255);
    std::sort(q.begin(), q.end());
    return q;
}

}  // namespace

TEST_F(JniProcessorTest, ProcessBufferRunsTheLookOverJavaArgbInts) {
    const int w = 32, h = 24;
    lookref::Picture picture(w, h, lookref::makeTestPicture(w, h, false));
    std::vector<jint> argb(w * h);
    for (int i = 0; i < w * h; ++i) {
        const uint8_t* p = &picture.rgba()[i * 4];
        argb[i] = static_cast<jint>((uint32_t(p[3]) << 24) | (uint32_t(p[0]) << 16) |
                                    (uint32_t(p[1]) << 8) | p[2]);
    }
    jintArray input = mEnv->NewIntArray(w * h);
    mEnv->SetIntArrayRegion(input, 0, w * h, argb.data());
    mProcessor->setEffect(401);
    jintArray result = mProcessor->processBuffer(mEnv, input, w, h);
    ASSERT_EQ("", KivTestJvm_takeException(mEnv));
    ASSERT_NE(nullptr, result);
    ASSERT_EQ(w * h, mEnv->GetArrayLength(result));
    std::vector<jint> out(w * h);
    mEnv->GetIntArrayRegion(result, 0, w * h, out.data());
    std::vector<uint8_t> want = lookref::render(401, picture, nullptr);
    for (int i = 0; i < w * h; ++i) {
        uint32_t v = static_cast<uint32_t>(out[i]);
        const int got[4] = {int(v >> 16 & 0xFF), int(v >> 8 & 0xFF), int(v & 0xFF), int(v >> 24)};
        for (int ch = 0; ch < 4; ++ch) ASSERT_NEAR(want[i * 4 + ch], got[ch], 2) << i << " " << ch;
    }
    // The input array is left as it was.
    std::vector<jint> again(w * h);
    mEnv->GetIntArrayRegion(input, 0, w * h, again.data());
    EXPECT_EQ(argb, again);
}

TEST_F(JniProcessorTest, BufferAndFileFailuresBecomeJavaExceptions) {
    EXPECT_EQ(nullptr, mProcessor->processBuffer(mEnv, nullptr, 4, 4));
    EXPECT_EQ("java.lang.NullPointerException: native_process_buffer: jinputbuffer is null",
              KivTestJvm_takeException(mEnv));
    // Fewer ints than pixels: refused rather than read past the array.
    jintArray small = mEnv->NewIntArray(15);
    EXPECT_EQ(nullptr, mProcessor->processBuffer(mEnv, small, 4, 4));
    EXPECT_EQ("java.lang.RuntimeException: native_process_buffer failed",
              KivTestJvm_takeException(mEnv));
    // No context: -7 from the draw.
    VFilterBufferedProcessorImpl uninitialised;
    jintArray pixels = mEnv->NewIntArray(16);
    EXPECT_EQ(nullptr, uninitialised.processBuffer(mEnv, pixels, 4, 4));
    EXPECT_EQ("java.lang.RuntimeException: native_process_buffer failed",
              KivTestJvm_takeException(mEnv));

    jstring some = mEnv->NewStringUTF((mDir + "/out.jpg").c_str());
    mProcessor->processFile(mEnv, nullptr, some);
    EXPECT_EQ("java.lang.NullPointerException: native_process_file: jinputfile is null",
              KivTestJvm_takeException(mEnv));
    mProcessor->processFile(mEnv, some, nullptr);
    EXPECT_EQ("java.lang.NullPointerException: native_process_file: joutfile is null",
              KivTestJvm_takeException(mEnv));
    mProcessor->processFile(mEnv, mEnv->NewStringUTF((mDir + "/missing.jpg").c_str()), some);
    EXPECT_EQ(
        "java.lang.RuntimeException: native_process_file: VCImage_decodeFromJpeg(inputfile) "
        "failed",
        KivTestJvm_takeException(mEnv));
}

TEST_F(JniProcessorTest, ProcessBitmapReturnsANewArgb8888Bitmap) {
    const int w = 20, h = 10;
    lookref::Picture picture(w, h, lookref::makeTestPicture(w, h, false));
    jobject bitmap = newBitmap(w, h, "ARGB_8888");
    ASSERT_NE(nullptr, bitmap);
    void* pixels = nullptr;
    ASSERT_EQ(ANDROID_BITMAP_RESULT_SUCCESS, AndroidBitmap_lockPixels(mEnv, bitmap, &pixels));
    memcpy(pixels, picture.rgba().data(), w * h * 4);
    ASSERT_EQ(ANDROID_BITMAP_RESULT_SUCCESS, AndroidBitmap_unlockPixels(mEnv, bitmap));

    mProcessor->setEffect(403);
    LogCapture log;
    jobject result = mProcessor->processBitmap(mEnv, bitmap);
    ASSERT_EQ("", KivTestJvm_takeException(mEnv));
    ASSERT_NE(nullptr, result);
    EXPECT_FALSE(mEnv->IsSameObject(result, bitmap));
    EXPECT_TRUE(log.contains(1, "process_bitmap: width:20, height:10, stride:80"));
    EXPECT_FALSE(log.contains("Bitmap format is not RGBA_8888!"));
    // Every lock was matched by an unlock.
    EXPECT_EQ(0, intCall(bitmap, "getLockCount"));
    EXPECT_EQ(0, intCall(result, "getLockCount"));
    AndroidBitmapInfo info;
    ASSERT_EQ(0, AndroidBitmap_getInfo(mEnv, result, &info));
    EXPECT_EQ(uint32_t(w), info.width);
    EXPECT_EQ(uint32_t(h), info.height);
    EXPECT_EQ(ANDROID_BITMAP_FORMAT_RGBA_8888, info.format);
    void* out = nullptr;
    ASSERT_EQ(0, AndroidBitmap_lockPixels(mEnv, result, &out));
    std::vector<uint8_t> got(static_cast<uint8_t*>(out), static_cast<uint8_t*>(out) + w * h * 4);
    AndroidBitmap_unlockPixels(mEnv, result);
    std::vector<uint8_t> want = lookref::render(403, picture, nullptr);
    for (size_t i = 0; i < want.size(); ++i) ASSERT_NEAR(want[i], got[i], 2) << i;
}

TEST_F(JniProcessorTest, ProcessBitmapOddCasesLogAndReturnNull) {
    // RGB_565 is processed as if it held RGBA_8888 rows.
    jobject rgb565 = newBitmap(8, 4, "RGB_565");
    ASSERT_NE(nullptr, rgb565);
    mProcessor->setEffect(400);
    {
        LogCapture log;
        jobject r = mProcessor->processBitmap(mEnv, rgb565);
        EXPECT_NE(nullptr, r);
        EXPECT_TRUE(log.contains(4, "Bitmap format is not RGBA_8888!"));
        EXPECT_TRUE(log.contains(1, "process_bitmap: width:8, height:4, stride:16"));
        EXPECT_EQ(0, intCall(rgb565, "getLockCount"));
    }
    EXPECT_EQ("", KivTestJvm_takeException(mEnv));
    EXPECT_EQ(nullptr, mProcessor->processBitmap(mEnv, nullptr));
    EXPECT_EQ("java.lang.NullPointerException: native_process_bitmap: jinputbitmap is null",
              KivTestJvm_takeException(mEnv));
    {
        // Not a bitmap at all: the info query fails, no exception.
        LogCapture log;
        EXPECT_EQ(nullptr, mProcessor->processBitmap(mEnv, mEnv->NewStringUTF("not a bitmap")));
        EXPECT_TRUE(log.contains(4, "AndroidBitmap_getInfo() failed!"));
        EXPECT_EQ("", KivTestJvm_takeException(mEnv));
    }
    VFilterBufferedProcessorImpl uninitialised;
    jobject bitmap = newBitmap(4, 4, "ARGB_8888");
    EXPECT_EQ(nullptr, uninitialised.processBitmap(mEnv, bitmap));
    EXPECT_EQ("java.lang.RuntimeException: native_process_bitmap failed",
              KivTestJvm_takeException(mEnv));
    EXPECT_EQ(0, intCall(bitmap, "getLockCount"));
}

TEST_F(JniProcessorTest, FailuresInsideTheDrawAndOfTheInputBitmap) {
    // A picture that cannot be read back is no Java failure: the array comes
    // back blank (never leftover heap bytes) and only the log tells.
    {
        LogCapture log;
        GlFault_failPictureReads(1);
        jintArray result = mProcessor->processBuffer(mEnv, mEnv->NewIntArray(16), 4, 4);
        GlFault_failPictureReads(0);
        EXPECT_EQ("", KivTestJvm_takeException(mEnv));
        ASSERT_NE(nullptr, result);
        EXPECT_EQ(16, mEnv->GetArrayLength(result));
        jint values[16];
        mEnv->GetIntArrayRegion(result, 0, 16, values);
        for (jint v : values) EXPECT_EQ(0, v);
        EXPECT_TRUE(log.contains(4, "EGL: Can't access this FBO's pixels"));
    }
    // A recycled bitmap has no pixels to lock: logged, null, no exception.
    {
        jobject bitmap = newBitmap(4, 4, "ARGB_8888");
        ASSERT_NE(nullptr, bitmap);
        jclass bitmapClass = mEnv->GetObjectClass(bitmap);
        mEnv->SetObjectField(
            bitmap, mEnv->GetFieldID(bitmapClass, "mBuffer", "Ljava/nio/ByteBuffer;"), nullptr);
        LogCapture log;
        EXPECT_EQ(nullptr, mProcessor->processBitmap(mEnv, bitmap));
        EXPECT_EQ("", KivTestJvm_takeException(mEnv));
        EXPECT_TRUE(log.contains(4, "AndroidBitmap_lockPixels(jinputbitmap) failed!"));
        EXPECT_EQ(0, intCall(bitmap, "getLockCount"));
    }
    // A draw that fails (no context: -7) throws for a file and for a JPEG buffer.
    const std::string in = mDir + "/in.jpg";
    std::vector<uint8_t> rgba = lookref::makeTestPicture(16, 8, true);
    VCImage* src = VCImage_createWrap(rgba.data(), 16, 8, VC_FORMAT_RGBA, 0, 0);
    ASSERT_EQ(0, VCImage_saveToFile(src, in.c_str(), 90));
    VCImage_destroy(src);
    VFilterBufferedProcessorImpl uninitialised;
    uninitialised.processFile(mEnv, mEnv->NewStringUTF(in.c_str()),
                              mEnv->NewStringUTF((mDir + "/out.jpg").c_str()));
    EXPECT_EQ("java.lang.RuntimeException: native_process_file failed",
              KivTestJvm_takeException(mEnv));
    std::vector<uint8_t> jpeg = fileBytes(in);
    jobject buffer = mEnv->NewDirectByteBuffer(jpeg.data(), static_cast<jlong>(jpeg.size()));
    EXPECT_EQ(nullptr, uninitialised.processImage(mEnv, buffer, static_cast<int>(jpeg.size())));
    EXPECT_EQ("java.lang.RuntimeException: process_file failed", KivTestJvm_takeException(mEnv));
}

TEST_F(JniProcessorTest, ProcessFileWritesAQuality98Jpeg) {
    const int w = 64, h = 48;
    std::vector<uint8_t> rgba = lookref::makeTestPicture(w, h, true);
    VCImage* src = VCImage_createWrap(rgba.data(), w, h, VC_FORMAT_RGBA, 0, 0);
    const std::string in = mDir + "/in.jpg", out = mDir + "/out.jpg";
    ASSERT_EQ(0, VCImage_saveToFile(src, in.c_str(), 60));
    VCImage_destroy(src);
    ASSERT_EQ(ijgLuminanceTable(60), firstQuantTable(fileBytes(in)));

    mProcessor->setEffect(402);
    mProcessor->processFile(mEnv, mEnv->NewStringUTF(in.c_str()), mEnv->NewStringUTF(out.c_str()));
    ASSERT_EQ("", KivTestJvm_takeException(mEnv));
    std::vector<uint8_t> written = fileBytes(out);
    ASSERT_GT(written.size(), 4u);
    EXPECT_EQ(0xFF, written[0]);
    EXPECT_EQ(0xD8, written[1]);
    EXPECT_EQ(ijgLuminanceTable(98), firstQuantTable(written));

    // Grey everywhere: the grayscale look ran over the picture.
    VCImage* result = VCImage_createEmpty(0, 0, VC_FORMAT_RGBA);
    ASSERT_EQ(0, VCImage_loadFromFile(result, out.c_str()));
    ASSERT_EQ(w, result->width);
    ASSERT_EQ(h, result->height);
    int worst = 0;
    for (int i = 0; i < w * h; ++i) {
        const uint8_t* p = result->data + i * 4;
        worst = std::max({worst, std::abs(p[0] - p[1]), std::abs(p[1] - p[2])});
    }
    EXPECT_LE(worst, 6);
    VCImage_destroy(result);
}

TEST_F(JniProcessorTest, ProcessImageReturnsADirectJpegBuffer) {
    const int w = 32, h = 16;
    std::vector<uint8_t> rgba = lookref::makeTestPicture(w, h, true);
    VCImage* src = VCImage_createWrap(rgba.data(), w, h, VC_FORMAT_RGBA, 0, 0);
    VCImage* jpeg = VCImage_encodeToJpeg(src, 90);
    VCImage_destroy(src);
    ASSERT_NE(nullptr, jpeg);
    jobject input = mEnv->NewDirectByteBuffer(jpeg->data, jpeg->size);
    mProcessor->setEffect(416);
    jobject result = mProcessor->processImage(mEnv, input, static_cast<int>(jpeg->size));
    ASSERT_EQ("", KivTestJvm_takeException(mEnv));
    ASSERT_NE(nullptr, result);
    auto* bytes = static_cast<uint8_t*>(mEnv->GetDirectBufferAddress(result));
    jlong length = mEnv->GetDirectBufferCapacity(result);
    ASSERT_NE(nullptr, bytes);
    ASSERT_GT(length, 4);
    EXPECT_EQ(0xFF, bytes[0]);
    EXPECT_EQ(0xD8, bytes[1]);
    EXPECT_EQ(0xFF, bytes[length - 2]);
    EXPECT_EQ(0xD9, bytes[length - 1]);
    EXPECT_EQ(ijgLuminanceTable(98), firstQuantTable(std::vector<uint8_t>(bytes, bytes + length)));
    // Native byte order, position 0.
    jclass bufferClass = mEnv->FindClass("java/nio/ByteBuffer");
    jclass orderClass = mEnv->FindClass("java/nio/ByteOrder");
    jobject order = mEnv->CallObjectMethod(
        result, mEnv->GetMethodID(bufferClass, "order", "()Ljava/nio/ByteOrder;"));
    jobject native = mEnv->CallStaticObjectMethod(
        orderClass, mEnv->GetStaticMethodID(orderClass, "nativeOrder", "()Ljava/nio/ByteOrder;"));
    EXPECT_TRUE(mEnv->IsSameObject(order, native));
    EXPECT_EQ(0, intCall(result, "position"));
    // The library hands the bytes over for good; this test is their last user.
    free(bytes);
    VCImage_destroy(jpeg);

    std::vector<uint8_t> garbage(64, 0x42);
    jobject bad = mEnv->NewDirectByteBuffer(garbage.data(), garbage.size());
    EXPECT_EQ(nullptr, mProcessor->processImage(mEnv, bad, 64));
    EXPECT_EQ("java.lang.RuntimeException: process_file: Failed to decode the jpeg image",
              KivTestJvm_takeException(mEnv));
}
