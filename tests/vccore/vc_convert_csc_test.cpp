// The optional conversion libraries: absent (plain run), complete stand-ins
// and incomplete ones. KIV_CSC_STANDIN names the case this process is run for
// (see csc_standin/CMakeLists.txt); the other cases skip.
#include <gtest/gtest.h>
#include <stdlib.h>
#include <string.h>

#include <string>
#include <vector>

#include "support/log_capture.h"
#include "vc_error_lines.h"
#include "vc_csc.h"
#include "vc_image_convert_fast.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_log.h"

namespace {

std::string standinCase() {
    const char* mode = getenv("KIV_CSC_STANDIN");
    return mode != nullptr ? mode : "";
}

const char* kOpenFailed = "VCConverter: Could not open the dynamic library for CSC.";
const char* kSymbolsMissing = "VCConverter: Could not find some symbols for CSC.";
const char* kInitFailed = "VCConverter: Could not create this converter.";
const char* kExternalOk = "[VCImage] Conversion successful with external CSC module";

// A BGRA image whose first pixel is (B 0x12, G 0x34, …) converted into NV12
// with its chroma displaced behind a gap.
struct HardwarePair {
    HardwarePair() : src(4 * 4 * 4, 0), dst(64, 0xEE) {
        src[0] = 0x12;
        src[1] = 0x34;
        in = VCImage_createWrap(src.data(), 4, 4, VC_FORMAT_BGRA, 64, 0);
        out = VCImage_createWrap(dst.data(), 4, 4, VC_FORMAT_NV12, 64, 32);
    }
    ~HardwarePair() {
        VCImage_destroy(in);
        VCImage_destroy(out);
    }
    std::vector<uint8_t> src, dst;
    VCImage* in;
    VCImage* out;
};

}  // namespace

TEST(VCConverterCsc, AbsentLibraryClearsTheFlagForGood) {
    if (!standinCase().empty()) GTEST_SKIP() << "run with stand-ins";
    LogCapture log;
    EXPECT_EQ(nullptr, VCConverter_create(64, 48, VC_FORMAT_NV21, VC_FORMAT_RGBA));
    EXPECT_TRUE(log.contains(VF_LOG_DEBUG, "VCConverter_create: 64x48 NV21 --> RGBA"));
    EXPECT_TRUE(log.contains(VF_LOG_ERROR, kOpenFailed));
    EXPECT_FALSE(log.contains("VCConverter: Calling vc_csc_init: 64x48 NV21 --> RGBA"));
    log.clear();
    // Sticky: no second attempt, no second error line.
    EXPECT_EQ(nullptr, VCConverter_create(32, 32, VC_FORMAT_YV12, VC_FORMAT_BGRA));
    EXPECT_TRUE(log.contains(VF_LOG_DEBUG, "VCConverter_create: 32x32 YV12 --> BGRA"));
    EXPECT_EQ(1u, log.lines().size());

    uint8_t px[16] = {};
    VCImage* img = VCImage_createWrap(px, 2, 2, VC_FORMAT_RGBA, 16, 0);
    log.clear();
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCConverter_convert(nullptr, img, img));
    EXPECT_EQ(1, countErrors(log, "VC_ERROR_NULL_PARAM", -2, "vccore/src/vc_image"));
    VCConverter_release(nullptr);
    VCImage_destroy(img);

    // The hardware pair flags the missing module, and the conversion falls back to the CPU.
    HardwarePair pair;
    log.clear();
    EXPECT_EQ(VC_ERROR_UNSUPPORTED, csc_run(pair.in, pair.out));
    EXPECT_EQ(1, countErrors(log, "VC_ERROR_NOT_IMPLEMENTED", -42, "vccore/src/vc_csc"));
    EXPECT_EQ(1, countErrors(log, "VC_ERROR_UNSUPPORTED", -6, "vccore/src/vc_csc"));
    EXPECT_EQ(0xEE, pair.dst[0]);
    log.clear();
    ASSERT_EQ(VC_OK, VCImage_convert(pair.in, pair.out));
    EXPECT_EQ(1, countErrors(log, "VC_ERROR_NOT_IMPLEMENTED", -42, "vccore/src/vc_csc"));
    EXPECT_FALSE(log.contains(kExternalOk));
    EXPECT_EQ((38470 * 0x34 + 7471 * 0x12) >> 16, pair.dst[0]);
    // Other pairs are refused without a word.
    log.clear();
    pair.out->format = VC_FORMAT_NV21;
    EXPECT_EQ(VC_ERROR_UNSUPPORTED, csc_run(pair.in, pair.out));
    EXPECT_EQ(VC_ERROR_UNSUPPORTED, csc_run(pair.out, pair.in));
    EXPECT_TRUE(log.lines().empty());
}

TEST(VCConverterCsc, PresentLibraryIsUsed) {
    if (standinCase() != "present") GTEST_SKIP() << "needs the complete stand-ins";
    LogCapture log;
    VCConverter* conv = VCConverter_create(64, 48, VC_FORMAT_NV21, VC_FORMAT_RGBA);
    ASSERT_NE(nullptr, conv);
    const std::vector<std::string> want = {"VCConverter_create: 64x48 NV21 --> RGBA",
                                           "VCConverter: Calling vc_csc_init: 64x48 NV21 --> RGBA"};
    EXPECT_EQ(want, log.texts());

    uint8_t px[16] = {};
    VCImage* a = VCImage_createWrap(px, 2, 2, VC_FORMAT_RGBA, 16, 0);
    VCImage* b = VCImage_createWrap(px, 2, 2, VC_FORMAT_NV21, 16, 0);
    // The stand-in answers width * 1000 + number of calls.
    EXPECT_EQ(64001, VCConverter_convert(conv, a, b));
    EXPECT_EQ(64002, VCConverter_convert(conv, a, b));
    VCImage* empty = VCImage_createEmpty(2, 2, VC_FORMAT_NV21);
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCConverter_convert(conv, a, empty));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCConverter_convert(conv, empty, b));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCConverter_convert(conv, a, nullptr));
    EXPECT_EQ(64003, VCConverter_convert(conv, a, b));
    VCConverter_release(conv);

    // A refused geometry keeps the library available.
    log.clear();
    EXPECT_EQ(nullptr, VCConverter_create(13, 2, VC_FORMAT_NV21, VC_FORMAT_RGBA));
    EXPECT_TRUE(log.contains(VF_LOG_ERROR, kInitFailed));
    VCConverter* again = VCConverter_create(8, 2, VC_FORMAT_NV21, VC_FORMAT_RGBA);
    ASSERT_NE(nullptr, again);
    EXPECT_EQ(8001, VCConverter_convert(again, a, b));
    VCConverter_release(again);
    VCImage_destroy(a);
    VCImage_destroy(b);
    VCImage_destroy(empty);

    // BGRA to NV12 goes through the plain-named entry, chroma at the offset;
    // the missing-module flag is still raised first.
    HardwarePair pair;
    log.clear();
    ASSERT_EQ(VC_OK, VCImage_convert(pair.in, pair.out));
    EXPECT_TRUE(log.contains(VF_LOG_DEBUG, kExternalOk));
    EXPECT_EQ(1, countErrors(log, "VC_ERROR_NOT_IMPLEMENTED", -42, "vccore/src/vc_csc"));
    EXPECT_EQ(0, countErrors(log, "VC_ERROR_UNSUPPORTED", -6, "vccore/src/vc_csc"));
    for (int i = 0; i < 16; ++i) EXPECT_EQ(0x12 ^ 0xF0, pair.dst[i]);
    for (int i = 16; i < 32; ++i) EXPECT_EQ(0xEE, pair.dst[i]);
    for (int i = 32; i < 40; ++i) EXPECT_EQ(0x34 ^ 0xF0, pair.dst[i]);
    EXPECT_EQ(0xEE, pair.dst[40]);

    // RGBA to NV12 is not the hardware pair.
    log.clear();
    pair.in->format = VC_FORMAT_RGBA;
    ASSERT_EQ(VC_OK, VCImage_convert(pair.in, pair.out));
    EXPECT_FALSE(log.contains(kExternalOk));
    EXPECT_EQ((19595 * 0x12 + 38470 * 0x34) >> 16, pair.dst[0]);
}

TEST(VCConverterCsc, IncompleteLibraries) {
    if (standinCase() != "partial") GTEST_SKIP() << "needs the incomplete stand-ins";
    LogCapture log;
    EXPECT_EQ(nullptr, VCConverter_create(64, 48, VC_FORMAT_NV21, VC_FORMAT_RGBA));
    EXPECT_TRUE(log.contains(VF_LOG_ERROR, kSymbolsMissing));
    EXPECT_FALSE(log.contains(kOpenFailed));
    log.clear();
    EXPECT_EQ(nullptr, VCConverter_create(64, 48, VC_FORMAT_NV21, VC_FORMAT_RGBA));
    EXPECT_FALSE(log.contains(kSymbolsMissing));
    EXPECT_EQ(1u, log.lines().size());

    // The NEON-named entry is taken when it is the one offered.
    HardwarePair pair;
    log.clear();
    ASSERT_EQ(VC_OK, VCImage_convert(pair.in, pair.out));
    EXPECT_TRUE(log.contains(VF_LOG_DEBUG, kExternalOk));
    EXPECT_EQ(0x12 ^ 0x0F, pair.dst[0]);
    EXPECT_EQ(0x34 ^ 0x0F, pair.dst[32]);
}

TEST(VCConverterCsc, LibcscEntryChoice) {
    const std::string mode = standinCase();
    if (mode != "both" && mode != "bare") GTEST_SKIP() << "needs a libcsc stand-in alone";
    HardwarePair pair;
    LogCapture log;
    ASSERT_EQ(VC_OK, VCImage_convert(pair.in, pair.out));
    EXPECT_EQ(1, countErrors(log, "VC_ERROR_NOT_IMPLEMENTED", -42, "vccore/src/vc_csc"));
    if (mode == "both") {
        // The NEON entry wins over the plain one.
        EXPECT_TRUE(log.contains(VF_LOG_DEBUG, kExternalOk));
        EXPECT_EQ(0x12 ^ 0x0F, pair.dst[0]);
        EXPECT_EQ(0x34 ^ 0x0F, pair.dst[32]);
    } else {
        // A library without either entry is as good as none: the CPU converts.
        EXPECT_FALSE(log.contains(kExternalOk));
        EXPECT_EQ(1, countErrors(log, "VC_ERROR_UNSUPPORTED", -6, "vccore/src/vc_csc"));
        EXPECT_EQ((38470 * 0x34 + 7471 * 0x12) >> 16, pair.dst[0]);
    }
}
