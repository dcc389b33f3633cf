// Logging: the entry and its level table, timing probes, trace markers, and
// every line and status the image core reports, one call a row.
#include <android/log.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <unistd.h>

#include <functional>
#include <string>
#include <vector>

#include "support/image_ptr.h"
#include "support/log_capture.h"
#include "support/temp_dir.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_file.h"
#include "vccore/vc_geometry.h"
#include "vccore/vc_log.h"
#include "vccore/vc_picture.h"

namespace {

using Bytes = std::vector<uint8_t>;

struct SentMessage {
    int priority;
    std::string tag, message;
};
std::vector<SentMessage> gSent;

void recordLogger(const struct __android_logger_data* data, const char* message) {
    gSent.push_back({data->priority, data->tag != nullptr ? data->tag : "", message});
}

TEST(VcLog, DefaultIsAndroidAndPrintsLabelThenMessage) {
    EXPECT_EQ(reinterpret_cast<void*>(AndroidLogMsg), reinterpret_cast<void*>(VF_LogMsg));
    __android_log_set_logger(recordLogger);
    __android_log_set_minimum_priority(ANDROID_LOG_VERBOSE);
    gSent.clear();
    testing::internal::CaptureStdout();
    AndroidLogMsg(5, "value %d of %s", 42, "x");  // first level past the table
    AndroidLogMsg(VF_LOG_ERROR, "broken");
    AndroidLogMsg(VF_LOG_INFO, "info");
    AndroidLogMsg(VF_LOG_WARNING, "warn");
    AndroidLogMsg(VF_LOG_VERBOSE, "verbose");
    AndroidLogMsg(VF_LOG_DEBUG, "debug");
    EXPECT_EQ("[V] value 42 of x\n[E] broken\n[I] info\n[W] warn\n[V] verbose\n[D] debug\n",
              testing::internal::GetCapturedStdout());
    // Unknown levels print as verbose; verbose and debug go out at debug priority.
    const int priorities[] = {ANDROID_LOG_DEBUG, ANDROID_LOG_ERROR, ANDROID_LOG_INFO,
                              ANDROID_LOG_WARN,  ANDROID_LOG_DEBUG, ANDROID_LOG_DEBUG};
    const char* messages[] = {"value 42 of x", "broken", "info", "warn", "verbose", "debug"};
    ASSERT_EQ(6u, gSent.size());
    for (size_t i = 0; i < gSent.size(); ++i)
        EXPECT_EQ(std::to_string(priorities[i]) + " kivcamera " + messages[i],
                  std::to_string(gSent[i].priority) + " " + gSent[i].tag + " " + gSent[i].message);
    gSent.clear();
    testing::internal::CaptureStdout();
    DefaultLogMsg(VF_LOG_WARNING, "only %s", "stdout");
    EXPECT_EQ("[W] only stdout\n", testing::internal::GetCapturedStdout());
    EXPECT_TRUE(gSent.empty());
    // Long lines reach standard output whole, and the Android log once.
    const std::string longText = std::string(3000, 'a') + "|" + std::string(3000, 'b');
    testing::internal::CaptureStdout();
    AndroidLogMsg(VF_LOG_INFO, "%s end", longText.c_str());
    EXPECT_TRUE(testing::internal::GetCapturedStdout() == "[I] " + longText + " end\n");
    EXPECT_EQ(1u, gSent.size());
    __android_log_set_logger(__android_log_stderr_logger);
}

int gTraceFd = -1;
int testMarker() {
    return gTraceFd;
}

TEST(VcLog, TraceRecordsGoToTheMarkerTheHookGives) {
    // Without a platform layer the image core traces nowhere, and nothing fails.
    ASSERT_EQ(-1, VF_TraceMarker());
    VF_TraceBegin("KI-nowhere");
    VF_TraceEnd();
    kivtest::TempDir dir;
    const std::string path = dir.file("trace");
    kivtest::writeFile(path, {});
    gTraceFd = open(path.c_str(), O_WRONLY);
    ASSERT_GE(gTraceFd, 0);
    VF_TraceMarker_t previous = VF_TraceMarker;
    VF_TraceMarker = testMarker;
    VF_TraceBegin("KI-render");
    VF_TraceEnd();
    { VFTraceSection section("KI-onDrawFrame"); }
    VF_TraceBegin(std::string(3000, 'n').c_str());
    VF_TraceMarker = previous;
    close(gTraceFd);
    const std::string pid = std::to_string(getpid());
    // Records are formatted into a 1024-byte buffer: long names are cut.
    EXPECT_EQ("B|" + pid + "|KI-renderEB|" + pid + "|KI-onDrawFrameE" +
                  ("B|" + pid + "|" + std::string(3000, 'n')).substr(0, 1023),
              kivtest::readText(path));
}

// Every line and status of the image core, one call a row. Error reports end
// in their source line, which moves with edits (":#"); debug traces are not
// pinned.
TEST(ImageCoreLog, LinesAndStatuses) {
    using namespace fourcc;
    auto error = [](const char* name, int code) {
        return "E " + std::string(name) + " (" + std::to_string(code) + "): vccore/src/vc_image:#";
    };
    auto e = [](const char* text) { return "E " + std::string(text); };
    auto w = [](const char* text) { return "W " + std::string(text); };
    const std::string kNull = error("VC_ERROR_NULL_PARAM", -2),
                      kParam = error("VC_ERROR_INVALID_PARAM", -3),
                      kSize = error("VC_ERROR_INVALID_SIZE", -4),
                      kUnsupported = error("VC_ERROR_UNSUPPORTED", -6),
                      kCodec = error("VC_ERROR_CODEC_FAILED", -9),
                      kUnknown = error("VC_ERROR_UNKNOWN", -1);
    kivtest::TempDir dir;
    kivtest::writeFile(dir.file("f.nv21"), Bytes(24, 1));
    Bytes px(100 * 100 * 4, 40);
    const uint32_t ABCD = VC_FOURCC('A', 'B', 'C', 'D');
    // A wrapped image (size field s) and a header.
    auto W = [&](int w, int h, uint32_t f, int s = 0) {
        return VCImageTest_wrap(px.data(), w, h, f, s);
    };
    auto H = [](int w, int h, uint32_t f) { return ImagePtr(VCImage_createEmpty(w, h, f)); };
    auto jpeg = [](ImagePtr i) { return ImagePtr(VCImage_encodeToJpeg(i.get(), 90)) ? 0 : -1; };
    auto path = [&](const char* name) { return dir.file(name); };
    LogCapture_expectRows({
        // clang-format off
        {[] { return VCError_report(-42, "core/egl/OpenGLManager", 321); },
         -42, {e("VC_ERROR_NOT_IMPLEMENTED (-42): core/egl/OpenGLManager:321")}},
        {[] { return VCError_report(-8, "core/egl/OpenGLManager", 3); },
         -8, {e("VC_ERROR_IO_FAILED (-8): core/egl/OpenGLManager:3")}},
        {[] { return VCImage_allocate(nullptr); }, -2, {kNull}},
        {[&] { return VCImage_allocate(H(4, 4, 0x20202020).get()); }, -3, {kParam}},
        {[&] { return VCImage_allocate(H(70000, 70000, RGBA).get()); }, -3, {kParam}},
        {[&] { return VCImage_allocate(H(30000, 30000, RGBA).get()); }, -4, {kSize}},
        {[&] { return VCImage_convert(nullptr, W(2, 2, RGBA).get()); }, -2, {kNull}},
        {[&] { return VCImage_convert(W(2, 2, RGBA).get(), H(2, 2, NV21).get()); }, -3, {kParam}},
        {[&] { return VCImage_convert(W(2, 2, JPEG, 64).get(), W(2, 2, RGBA).get()); },
         -6, {e("[VCImage] Can not convert JPEG into RGBA"), kUnsupported}},
        {[&] { return VCImage_convert(W(2, 2, RGBA).get(), W(7, 1, RGBA, 10).get()); }, -4, {kSize}},
        {[&] { return VCImage_scale(W(4, 4, RGBA).get(), H(0, 10, RGBA).get()); },
         -4, {e("VCImage_scale: invalid image dimensions (<=0)"), kSize}},
        {[&] { return VCImage_scale(W(4, 4, RGBA).get(), H(2, 2, NV21).get()); },
         -3, {e("VCImage_scale supports only ANDROID_BITMAP format for now"), kParam}},
        // A target too large to allocate reports the allocation's own error first.
        {[&] { return VCImage_scale(W(4, 4, RGBA).get(), H(40000, 40000, RGBA).get()); },
         -3, {kParam, e("VCImage_scale: allocation failed (0 bytes)")}},
        {[&] { return VCImage_crop(W(8, 4, GREY).get(), H(2, 2, GREY).get(), 0, 0); }, -6, {kUnsupported}},
        {[&] { return VCImage_rotate(W(2, 2, RGBA, 20).get(), 90); }, -4, {kSize}},
        {[&] { return VCImage_rotate(W(4, 2, GREY).get(), 90); },
         0,
         {w("Rotation is supported on RGBA images only for now: using temporary RGBA copy of "
            "this 4x2 'GREY' image")}},
        {[&] { return VCImage_drawImage(W(10, 10, RGBA).get(), W(100, 100, RGBA).get(), -20, 0); },
         0,
         {w("In VCImage_drawImage, the source image 10x10 is completely out of the destination "
            "100x100 at -20,0")}},
        {[&] { return VCImage_drawImage(W(10, 10, RGBA).get(), W(100, 100, RGBA).get(), -10, 5); },
         0, {w("Nothing to draw (lines = 10, cols = 0)")}},
        {[&] { return VCImage_drawImage(W(4, 2, NV21).get(), W(8, 4, NV21).get(), 1, 0); },
         -6, {e("Unsupported dimensions for YUV420: 4x2 offset 1,0"), kUnsupported}},
        // Null pictures are refused silently; the others with "%4.4s" of the format.
        {[&] { return jpeg(nullptr); }, -1, {}},
        {[&] { return jpeg(H(64, 48, RGBA)); }, -1, {}},
        {[&] { return jpeg(W(0, 48, RGBA)); }, -1, {e("Encoding failed (0x48 RGBA)")}},
        {[&] { return jpeg(W(64, 0, RGBA)); }, -1, {e("Encoding failed (64x0 RGBA)")}},
        {[&] { return jpeg(W(64, 48, 0)); }, -1, {e("Encoding failed (64x48     )")}},
        {[&] { return jpeg(W(64, 48, ABCD)); }, -1, {e("Encoding failed (64x48 ABCD)")}},
        {[&] { return jpeg(W(64, 48, JPEG)); }, -1, {e("Encoding failed (64x48 JPEG)")}},
        {[&] { return jpeg(W(64, 48, RGBA, 100)); }, -1, {e("Encoding failed (64x48 RGBA)")}},
        {[&] { return jpeg(W(64, 48, RGB8, 64 * 48 * 3 - 1)); }, -1, {e("Encoding failed (64x48 RGB8)")}},
        {[&] { return jpeg(W(63, 48, NV21)); }, -1, {e("Encoding failed (63x48 NV21)")}},
        {[&] { return VCImage_decodeFromJpeg(nullptr, px.data(), 10); }, -2, {kNull}},
        {[&] { return VCImage_decodeFromJpeg(H(0, 0, RGBA).get(), px.data(), 64); }, -9, {kCodec}},
        {[&] {int x; return VCPicture_readHeader(px.data(), 64, &x, &x);}, -9, {kCodec}},
        {[&] {int x; return VCPicture_readHeader(nullptr, 64, &x, &x);}, -2, {kNull}},
        // A JPEG that cannot be encoded is still 0 for saving.
        {[&] { return VCImage_saveToFile(W(5, 5, ABCD, 100).get(), path("bad.jpg").c_str(), 85); },
         0, {e("Encoding failed (5x5 ABCD)")}},
        {[&] { return VCImage_saveToFile(nullptr, "x.jpg", 85); }, -2, {kNull}},
        {[&] { return VCImage_saveToFile(W(3, 3, NV21, 14).get(), path("o.png").c_str(), 85); },
         -1, {kSize, kUnknown}},
        {[&] { return VCImage_saveToFile(W(4, 4, RGBA).get(), path("no/x.png").c_str(), 85); },
         -1, {e("Failed to save RGBA image with Skia!"), kUnknown}},
        {[&] { return save_to_file(path("no/x.bin").c_str(), px.data(), 1), 0; },
         0, {e("failed to create file: No such file or directory")}},
        {[&] { return save_to_file("/dev/full", px.data(), 4), 0; },
         0, {e("failed to write to file: No space left on device")}},
        // A picture that does not decode is taken for raw pixels of a known geometry.
        {[&] { return VCImage_loadFromFile(H(4, 4, NV21).get(), path("f.nv21").c_str()); }, 0, {kCodec}},
        {[&] { return VCImage_loadFromFile(H(0, 0, RGBA).get(), path("absent").c_str()); },
         -8, {error("VC_ERROR_IO_FAILED", -8)}},
        {[&] { return VCImage_loadFromFile(nullptr, "x"); }, -2, {kNull}},
        // clang-format on
    });
}

}  // namespace
