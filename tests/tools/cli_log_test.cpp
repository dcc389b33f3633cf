// The tool's log handlers: which library lines count as failures.
#include <android/log.h>
#include <gtest/gtest.h>

#include "cli_log.h"
#include "vccore/vc_error.h"
#include "vccore/vc_log.h"

namespace {

using namespace kivcli;

TEST(CliLog, RecognisesErrorReportsOnly) {
    EXPECT_TRUE(
        cliLogIsErrorReport("VC_ERROR_UNKNOWN (-1): core/VFilterBufferedProcessorImpl:210"));
    EXPECT_TRUE(cliLogIsErrorReport("VC_ERROR_INVALID_STATE (-7): core/egl/EglImage:88"));
    // Error-level diagnostics the library prints while working normally.
    EXPECT_FALSE(
        cliLogIsErrorReport("EGL: lockGraphicBuffer format : 1, width : 960, stride : 960"));
    EXPECT_FALSE(cliLogIsErrorReport(
        "Input format 'NV21' is not a native format for EglImage: Conversion required to RGBA"));
    EXPECT_FALSE(cliLogIsErrorReport("VC_ERROR_UNKNOWN"));
    EXPECT_FALSE(cliLogIsErrorReport("  VC_ERROR_UNKNOWN (-1): x:1"));
    EXPECT_FALSE(cliLogIsErrorReport(""));
    EXPECT_FALSE(cliLogIsErrorReport(nullptr));
}

TEST(CliLog, CountsReportsFromBothLogs) {
    cliLogSetup(false);
    int before = cliLogErrorCount();

    // The image core's own report function, as every failure in vccore uses it.
    VCError_report(VC_ERROR_IO_FAILED, "vccore/src/vc_image", 12);
    EXPECT_EQ(before + 1, cliLogErrorCount());

    // A report on the Android log, as the GL side writes them.
    __android_log_print(ANDROID_LOG_ERROR, "KivImaging::EGL", "%s (%d): %s:%d",
                        "VC_ERROR_INVALID_STATE", -7, "core/VFilterBufferedProcessorImpl", 99);
    EXPECT_EQ(before + 2, cliLogErrorCount());

    // Diagnostics at error level, and reports below error level, do not count.
    __android_log_print(ANDROID_LOG_ERROR, "KivImaging::EGL", "EGL: lockGraphicBuffer format : %x",
                        1);
    VF_LogMsg(VF_LOG_ERROR, "Encoding failed (%dx%d %4.4s)", 4, 4, "RGBA");
    VF_LogMsg(VF_LOG_DEBUG, "VC_ERROR_UNKNOWN (-1): %s:%d", "x", 1);
    __android_log_print(ANDROID_LOG_WARN, "KivImaging::EGL", "VC_ERROR_UNKNOWN (-1): x:1");
    EXPECT_EQ(before + 2, cliLogErrorCount());
}

}  // namespace
