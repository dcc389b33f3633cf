// The Java-facing operations of the buffered processor inside a real JVM:
// int[] pixels, Bitmaps (host stand-in class and libjnigraphics), JPEG files
// and direct buffers, with their Java exceptions and log lines.
#include <android/bitmap.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <string>
#include <vector>

#include "support/gl_fault.h"
#include "support/image_ptr.h"
#include "support/jvm.h"
#include "support/log_capture.h"
#include "support/look_reference.h"
#include "support/picture_streams.h"
#include "support/processor_ptr.h"
#include "support/temp_dir.h"
#include "vccore/vc_file.h"

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

using kivtest::Bytes;

class JniProcessorTest : public ::testing::Test {
protected:
    void SetUp() override {
        mEnv = KivTestJvm_start(KIV_TEST_LIBJVM, KIV_TEST_JAVA_CLASSES);
        ASSERT_NE(nullptr, mEnv) << "no JVM from " << KIV_TEST_LIBJVM;
        mEnv->PushLocalFrame(256);
        mProcessor = ProcessorTest_create();
    }
    void TearDown() override {
        mProcessor.reset();
        if (mEnv != nullptr) mEnv->PopLocalFrame(nullptr);
    }
    jobject newBitmap(int width, int height, const char* config, const Bytes& rgba = {}) {
        jclass bitmapClass = mEnv->FindClass("android/graphics/Bitmap");
        jclass configClass = mEnv->FindClass("android/graphics/Bitmap$Config");
        if (bitmapClass == nullptr || configClass == nullptr) return nullptr;
        jobject c = mEnv->CallStaticObjectMethod(
            configClass,
            mEnv->GetStaticMethodID(configClass, "valueOf",
                                    "(Ljava/lang/String;)Landroid/graphics/Bitmap$Config;"),
            mEnv->NewStringUTF(config));
        jobject bitmap = mEnv->CallStaticObjectMethod(
            bitmapClass,
            mEnv->GetStaticMethodID(
                bitmapClass, "createBitmap",
                "(IILandroid/graphics/Bitmap$Config;)Landroid/graphics/Bitmap;"),
            width, height, c);
        void* pixels = nullptr;
        if (!rgba.empty() && AndroidBitmap_lockPixels(mEnv, bitmap, &pixels) == 0) {
            memcpy(pixels, rgba.data(), rgba.size());
            AndroidBitmap_unlockPixels(mEnv, bitmap);
        }
        return bitmap;
    }
    int intCall(jobject object, const char* method) {
        return mEnv->CallIntMethod(object,
                                   mEnv->GetMethodID(mEnv->GetObjectClass(object), method, "()I"));
    }
    std::string writeJpeg(const char* name, int w, int h, int quality) {
        Bytes rgba = lookref::makeTestPicture(w, h, true);
        const std::string path = mDir.file(name);
        EXPECT_EQ(0, VCImage_saveToFile(VCImageTest_wrap(rgba.data(), w, h, VC_FORMAT_RGBA).get(),
                                        path.c_str(), quality));
        return path;
    }
    jstring str(const std::string& s) { return mEnv->NewStringUTF(s.c_str()); }

    JNIEnv* mEnv = nullptr;
    ProcessorPtr mProcessor;
    kivtest::TempDir mDir;
};

// Sepia over Java's ARGB ints, whose input array is left as it was.
TEST_F(JniProcessorTest, ProcessBufferRunsTheLookOverJavaArgbInts) {
    const int w = 32, h = 24;
    lookref::Picture picture(w, h, lookref::makeTestPicture(w, h, false));
    std::vector<jint> argb(w * h), out(w * h), again(w * h);
    for (int i = 0; i < w * h; ++i) {
        const uint8_t* p = &picture.rgba()[i * 4];
        argb[i] = static_cast<jint>(uint32_t(p[3]) << 24 | uint32_t(p[0]) << 16 |
                                    uint32_t(p[1]) << 8 | p[2]);
    }
    jintArray input = mEnv->NewIntArray(w * h);
    mEnv->SetIntArrayRegion(input, 0, w * h, argb.data());
    mProcessor->setEffect(401);
    jintArray result = mProcessor->processBuffer(mEnv, input, w, h);
    ASSERT_EQ("", KivTestJvm_takeException(mEnv));
    ASSERT_NE(nullptr, result);
    ASSERT_EQ(w * h, mEnv->GetArrayLength(result));
    mEnv->GetIntArrayRegion(result, 0, w * h, out.data());
    Bytes got;
    for (jint v : out)
        got.insert(got.end(),
                   {uint8_t(v >> 16), uint8_t(v >> 8), uint8_t(v), uint8_t(uint32_t(v) >> 24)});
    lookref::expectPixels(lookref::render(401, picture, nullptr), nullptr, got.data(), w, h, 2,
                          "ARGB ints");
    mEnv->GetIntArrayRegion(input, 0, w * h, again.data());
    EXPECT_EQ(argb, again);
}

// Negative into a new ARGB_8888 bitmap; every lock matched by an unlock.
TEST_F(JniProcessorTest, ProcessBitmapReturnsANewArgb8888Bitmap) {
    const int w = 20, h = 10;
    lookref::Picture picture(w, h, lookref::makeTestPicture(w, h, false));
    jobject bitmap = newBitmap(w, h, "ARGB_8888", picture.rgba());
    ASSERT_NE(nullptr, bitmap);
    mProcessor->setEffect(403);
    LogCapture log;
    jobject result = mProcessor->processBitmap(mEnv, bitmap);
    ASSERT_EQ("", KivTestJvm_takeException(mEnv));
    ASSERT_NE(nullptr, result);
    EXPECT_FALSE(mEnv->IsSameObject(result, bitmap));
    EXPECT_FALSE(log.contains("Bitmap format is not RGBA_8888!"));
    EXPECT_EQ(0, intCall(bitmap, "getLockCount") + intCall(result, "getLockCount"));
    AndroidBitmapInfo info;
    ASSERT_EQ(0, AndroidBitmap_getInfo(mEnv, result, &info));
    EXPECT_EQ(std::vector<uint32_t>({uint32_t(w), uint32_t(h), ANDROID_BITMAP_FORMAT_RGBA_8888}),
              std::vector<uint32_t>({info.width, info.height, uint32_t(info.format)}));
    void* out = nullptr;
    ASSERT_EQ(0, AndroidBitmap_lockPixels(mEnv, result, &out));
    lookref::expectPixels(lookref::render(403, picture, nullptr), nullptr,
                          static_cast<uint8_t*>(out), w, h, 2, "bitmap");
    AndroidBitmap_unlockPixels(mEnv, result);
    // RGB_565 is processed as if it held RGBA_8888 rows, with a word.
    jobject rgb565 = newBitmap(8, 4, "RGB_565");
    log.clear();
    EXPECT_NE(nullptr, mProcessor->processBitmap(mEnv, rgb565));
    EXPECT_TRUE(log.contains(VF_LOG_ERROR, "Bitmap format is not RGBA_8888!"));
    EXPECT_EQ(0, intCall(rgb565, "getLockCount"));
}

// Each failure: the Java exception it becomes (or none), its log line, no
// lock left on a bitmap. A picture that cannot be read back is no Java
// failure: the array comes back blank (never leftover heap bytes).
TEST_F(JniProcessorTest, FailuresBecomeJavaExceptionsOrLogLines) {
    VFilterBufferedProcessorImpl none;  // never initialised: -7 from the draw
    const std::string in = writeJpeg("in.jpg", 16, 8, 90), out = mDir.file("out.jpg");
    Bytes jpeg = kivtest::readFile(in), garbage(64, 0x42);
    jobject bitmap = newBitmap(4, 4, "ARGB_8888"), recycled = newBitmap(4, 4, "ARGB_8888");
    mEnv->SetObjectField(
        recycled,
        mEnv->GetFieldID(mEnv->GetObjectClass(recycled), "mBuffer", "Ljava/nio/ByteBuffer;"),
        nullptr);
    const std::string npe = "java.lang.NullPointerException: ",
                      rte = "java.lang.RuntimeException: ";
    const struct {
        std::function<bool()> call;  // whether it returned null
        std::string exception, line;
    } rows[] = {
        {[&] { return !mProcessor->processBuffer(mEnv, nullptr, 4, 4); },
         npe + "native_process_buffer: jinputbuffer is null", ""},
        // Fewer ints than pixels: refused rather than read past the array.
        {[&] { return !mProcessor->processBuffer(mEnv, mEnv->NewIntArray(15), 4, 4); },
         rte + "native_process_buffer failed", ""},
        {[&] { return !none.processBuffer(mEnv, mEnv->NewIntArray(16), 4, 4); },
         rte + "native_process_buffer failed", ""},
        {[&] { return mProcessor->processFile(mEnv, nullptr, str(out)), true; },
         npe + "native_process_file: jinputfile is null", ""},
        {[&] { return mProcessor->processFile(mEnv, str(in), nullptr), true; },
         npe + "native_process_file: joutfile is null", ""},
        {[&] {
             return mProcessor->processFile(mEnv, str(mDir.file("missing.jpg")), str(out)), true;
         },
         rte + "native_process_file: VCImage_decodeFromJpeg(inputfile) failed", ""},
        {[&] { return none.processFile(mEnv, str(in), str(out)), true; },
         rte + "native_process_file failed", ""},
        {[&] {
             return !none.processImage(mEnv, mEnv->NewDirectByteBuffer(jpeg.data(), jpeg.size()),
                                       jpeg.size());
         },
         rte + "process_file failed", ""},
        {[&] {
             return !mProcessor->processImage(mEnv, mEnv->NewDirectByteBuffer(garbage.data(), 64),
                                              64);
         },
         rte + "process_file: Failed to decode the jpeg image", ""},
        {[&] { return !mProcessor->processBitmap(mEnv, nullptr); },
         npe + "native_process_bitmap: jinputbitmap is null", ""},
        {[&] { return !none.processBitmap(mEnv, bitmap); }, rte + "native_process_bitmap failed",
         ""},
        // Not a bitmap at all, or a recycled one without pixels: logged, null.
        {[&] { return !mProcessor->processBitmap(mEnv, str("not a bitmap")); }, "",
         "AndroidBitmap_getInfo() failed!"},
        {[&] { return !mProcessor->processBitmap(mEnv, recycled); }, "",
         "AndroidBitmap_lockPixels(jinputbitmap) failed!"},
    };
    for (const auto& r : rows) {
        LogCapture log;
        EXPECT_TRUE(r.call()) << r.exception << r.line;
        EXPECT_EQ(r.exception, KivTestJvm_takeException(mEnv));
        EXPECT_TRUE(r.line.empty() || log.contains(VF_LOG_ERROR, r.line)) << r.line;
    }
    EXPECT_EQ(0, intCall(bitmap, "getLockCount") + intCall(recycled, "getLockCount"));
    LogCapture log;
    GlFault_failPictureReads(1);
    jintArray result = mProcessor->processBuffer(mEnv, mEnv->NewIntArray(16), 4, 4);
    GlFault_failPictureReads(0);
    EXPECT_EQ("", KivTestJvm_takeException(mEnv));
    ASSERT_NE(nullptr, result);
    std::vector<jint> values(16, -1);
    mEnv->GetIntArrayRegion(result, 0, 16, values.data());
    EXPECT_EQ(std::vector<jint>(16, 0), values);
    EXPECT_TRUE(log.contains(VF_LOG_ERROR, "EGL: Can't access this FBO's pixels"));
}

// The file and the direct buffer come back as quality 98 JPEGs, whatever the
// input's quality; the buffer in native byte order at position 0, handed over.
TEST_F(JniProcessorTest, FileAndDirectBufferBecomeQuality98Jpegs) {
    const std::string in = writeJpeg("in.jpg", 64, 48, 60), out = mDir.file("out.jpg");
    ASSERT_EQ(kivtest::lumaTableForQuality(60), kivtest::lumaTable(kivtest::readFile(in)));
    mProcessor->setEffect(402);
    mProcessor->processFile(mEnv, str(in), str(out));
    ASSERT_EQ("", KivTestJvm_takeException(mEnv));
    EXPECT_EQ(kivtest::lumaTableForQuality(98), kivtest::lumaTable(kivtest::readFile(out)));
    // Grey everywhere: the grayscale look ran over the picture.
    ImagePtr result(VCImage_createEmpty(0, 0, VC_FORMAT_RGBA));
    ASSERT_EQ(0, VCImage_loadFromFile(result.get(), out.c_str()));
    ASSERT_EQ(64 * 100 + 48, result->width * 100 + result->height);
    int worst = 0;
    for (int i = 0; i < 64 * 48; ++i) {
        const uint8_t* p = result->data + i * 4;
        worst = std::max({worst, std::abs(p[0] - p[1]), std::abs(p[1] - p[2])});
    }
    EXPECT_LE(worst, 6);

    Bytes jpeg = kivtest::readFile(in);
    mProcessor->setEffect(416);
    jobject buffer = mProcessor->processImage(
        mEnv, mEnv->NewDirectByteBuffer(jpeg.data(), jpeg.size()), static_cast<int>(jpeg.size()));
    ASSERT_EQ("", KivTestJvm_takeException(mEnv));
    ASSERT_NE(nullptr, buffer);
    auto* bytes = static_cast<uint8_t*>(mEnv->GetDirectBufferAddress(buffer));
    const Bytes stream(bytes, bytes + mEnv->GetDirectBufferCapacity(buffer));
    ASSERT_GT(stream.size(), 4u);
    EXPECT_EQ(Bytes({0xFF, 0xD8, 0xFF, 0xD9}),
              Bytes({stream[0], stream[1], stream[stream.size() - 2], stream.back()}));
    EXPECT_EQ(kivtest::lumaTableForQuality(98), kivtest::lumaTable(stream));
    jclass bufferClass = mEnv->FindClass("java/nio/ByteBuffer"),
           orderClass = mEnv->FindClass("java/nio/ByteOrder");
    jobject order = mEnv->CallObjectMethod(
        buffer, mEnv->GetMethodID(bufferClass, "order", "()Ljava/nio/ByteOrder;"));
    jobject native = mEnv->CallStaticObjectMethod(
        orderClass, mEnv->GetStaticMethodID(orderClass, "nativeOrder", "()Ljava/nio/ByteOrder;"));
    EXPECT_TRUE(mEnv->IsSameObject(order, native));
    EXPECT_EQ(0, intCall(buffer, "position"));
    free(bytes);  // the library hands the bytes over for good; this test is their last user
}

}  // namespace
