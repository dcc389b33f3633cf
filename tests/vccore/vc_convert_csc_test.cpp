// The optional conversion libraries: absent (plain run), complete stand-ins
// and incomplete ones. KIV_CSC_STANDIN names the case this process is run for
// (see csc_standin/CMakeLists.txt); the other cases skip.
#include <gtest/gtest.h>
#include <stdlib.h>

#include <string>
#include <vector>

#include "support/image_ptr.h"
#include "support/log_capture.h"
#include "vc_csc.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_log.h"

namespace {

using Bytes = std::vector<uint8_t>;

std::string standinCase() {
    const char* mode = getenv("KIV_CSC_STANDIN");
    return mode != nullptr ? mode : "";
}

const std::string kNotImplemented = "E VC_ERROR_NOT_IMPLEMENTED (-42): vccore/src/vc_csc:#",
                  kUnsupported = "E VC_ERROR_UNSUPPORTED (-6): vccore/src/vc_csc:#";

// A BGRA image whose first pixel is (B 0x12, G 0x34, …) converted into NV12
// with its chroma displaced behind a gap: the hardware pair. The stand-in
// libcsc fills luma and chroma from the first pixel's B and G, xor 0x0F from
// its NEON entry, xor 0xF0 from the plain one.
struct HardwarePair {
    Bytes src = Bytes(64, 0), dst = Bytes(64, 0xEE);
    ImagePtr in, out;
    HardwarePair() {
        src[0] = 0x12, src[1] = 0x34;
        in = VCImageTest_wrap(src.data(), 4, 4, VC_FORMAT_BGRA, 64);
        out = VCImageTest_wrap(dst.data(), 4, 4, VC_FORMAT_NV12, 64, 32);
    }
    // Luma 0..15, the gap 16..31, chroma 32..39, then untouched.
    Bytes expected(int luma, int chroma) const {
        Bytes want(16, luma);
        want.insert(want.end(), 16, 0xEE);
        want.insert(want.end(), 8, chroma);
        return want;
    }
    Bytes written() const { return Bytes(dst.begin(), dst.begin() + 40); }
};
const int kCpuLuma = (38470 * 0x34 + 7471 * 0x12) >> 16;  // B 0x12, G 0x34, R 0

TEST(VCConverterCsc, AbsentLibraryClearsTheFlagForGood) {
    if (!standinCase().empty()) GTEST_SKIP() << "run with stand-ins";
    LogCapture log;
    EXPECT_EQ(nullptr, VCConverter_create(64, 48, VC_FORMAT_NV21, VC_FORMAT_RGBA));
    EXPECT_TRUE(log.matches({"E VCConverter: Could not open the dynamic library for CSC."}));
    // Sticky: no second attempt, no second error line.
    log.clear();
    EXPECT_EQ(nullptr, VCConverter_create(32, 32, VC_FORMAT_YV12, VC_FORMAT_BGRA));
    EXPECT_EQ(1u, log.lines().size());
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCConverter_convert(nullptr, nullptr, nullptr));
    VCConverter_release(nullptr);

    // The hardware pair flags the missing module and falls back to the CPU.
    HardwarePair pair;
    log.clear();
    EXPECT_EQ(VC_ERROR_UNSUPPORTED, csc_run(pair.in.get(), pair.out.get()));
    EXPECT_TRUE(log.matches({kNotImplemented, kUnsupported}));
    EXPECT_EQ(0xEE, pair.dst[0]);
    log.clear();
    ASSERT_EQ(VC_OK, VCImage_convert(pair.in.get(), pair.out.get()));
    EXPECT_TRUE(log.matches({kNotImplemented, kUnsupported}));
    EXPECT_EQ(kCpuLuma, pair.dst[0]);
    // Other pairs are refused without a word.
    log.clear();
    pair.out->format = VC_FORMAT_NV21;
    EXPECT_EQ(VC_ERROR_UNSUPPORTED, csc_run(pair.in.get(), pair.out.get()));
    EXPECT_EQ(VC_ERROR_UNSUPPORTED, csc_run(pair.out.get(), pair.in.get()));
    EXPECT_TRUE(log.lines().empty());
}

TEST(VCConverterCsc, PresentLibraryIsUsed) {
    if (standinCase() != "present") GTEST_SKIP() << "needs the complete stand-ins";
    LogCapture log;
    VCConverter* conv = VCConverter_create(64, 48, VC_FORMAT_NV21, VC_FORMAT_RGBA);
    ASSERT_NE(nullptr, conv);
    uint8_t px[16] = {};
    ImagePtr a = VCImageTest_wrap(px, 2, 2, VC_FORMAT_RGBA, 16);
    ImagePtr b = VCImageTest_wrap(px, 2, 2, VC_FORMAT_NV21, 16);
    ImagePtr empty(VCImage_createEmpty(2, 2, VC_FORMAT_NV21));
    // The stand-in answers width * 1000 + number of calls; refusals never reach it.
    EXPECT_EQ(64001, VCConverter_convert(conv, a.get(), b.get()));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCConverter_convert(conv, a.get(), empty.get()));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCConverter_convert(conv, empty.get(), b.get()));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCConverter_convert(conv, a.get(), nullptr));
    EXPECT_EQ(64002, VCConverter_convert(conv, a.get(), b.get()));
    const std::string kNull = "E VC_ERROR_NULL_PARAM (-2): vccore/src/vc_image:#";
    EXPECT_TRUE(log.matches({kNull, kNull, kNull}));  // the refusals only
    VCConverter_release(conv);
    // A refused geometry keeps the library available.
    log.clear();
    EXPECT_EQ(nullptr, VCConverter_create(13, 2, VC_FORMAT_NV21, VC_FORMAT_RGBA));
    EXPECT_TRUE(log.contains(VF_LOG_ERROR, "VCConverter: Could not create this converter."));
    VCConverter* again = VCConverter_create(8, 2, VC_FORMAT_NV21, VC_FORMAT_RGBA);
    ASSERT_NE(nullptr, again);
    EXPECT_EQ(8001, VCConverter_convert(again, a.get(), b.get()));
    VCConverter_release(again);

    // BGRA to NV12 goes through the plain-named entry, chroma at the offset;
    // the missing-module flag is still raised first.
    HardwarePair pair;
    log.clear();
    ASSERT_EQ(VC_OK, VCImage_convert(pair.in.get(), pair.out.get()));
    EXPECT_TRUE(log.matches({kNotImplemented}));
    EXPECT_EQ(pair.expected(0x12 ^ 0xF0, 0x34 ^ 0xF0), pair.written());
    // RGBA to NV12 is not the hardware pair.
    log.clear();
    pair.in->format = VC_FORMAT_RGBA;
    ASSERT_EQ(VC_OK, VCImage_convert(pair.in.get(), pair.out.get()));
    EXPECT_EQ((19595 * 0x12 + 38470 * 0x34) >> 16, pair.dst[0]);
}

TEST(VCConverterCsc, IncompleteLibrariesAndEntryChoice) {
    const std::string mode = standinCase();
    if (mode != "partial" && mode != "both" && mode != "bare") GTEST_SKIP() << "other stand-ins";
    LogCapture log;
    if (mode == "partial") {
        // Twice: the missing symbol is reported once.
        for (int i = 0; i < 2; ++i)
            EXPECT_EQ(nullptr, VCConverter_create(64, 48, VC_FORMAT_NV21, VC_FORMAT_RGBA));
        EXPECT_TRUE(log.matches({"E VCConverter: Could not find some symbols for CSC."}));
    }
    HardwarePair pair;
    log.clear();
    ASSERT_EQ(VC_OK, VCImage_convert(pair.in.get(), pair.out.get()));
    if (mode == "bare") {
        // A libcsc without either entry is as good as none: the CPU converts.
        EXPECT_TRUE(log.matches({kNotImplemented, kUnsupported}));
        EXPECT_EQ(kCpuLuma, pair.dst[0]);
    } else {
        // The NEON entry is taken when offered, also over the plain one.
        EXPECT_TRUE(log.matches({kNotImplemented}));
        EXPECT_EQ(pair.expected(0x12 ^ 0x0F, 0x34 ^ 0x0F), pair.written());
    }
}

}  // namespace
