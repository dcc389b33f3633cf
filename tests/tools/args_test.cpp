// The tool's own pieces: option parsing, numbers and sizes, the progress line,
// and which library log lines count as failures.
#include <android/log.h>
#include <gtest/gtest.h>
#include <stdio.h>
#include <stdlib.h>

#include <vector>

#include "args.h"
#include "cli_log.h"
#include "live_stats.h"
#include "progress.h"
#include "vccore/vc_error.h"
#include "vccore/vc_log.h"

namespace {

using namespace kivcli;

const OptionSpec kSpecs[] = {
    {'e', "effect", true}, {'o', "output", true}, {'v', "verbose", false}, {0, "thumb", true}};

bool parse(std::vector<const char*> argv, ParsedArgs* out, std::string* error) {
    argv.insert(argv.begin(), "cmd");
    return parseArgs(static_cast<int>(argv.size()), const_cast<char**>(argv.data()), 1, kSpecs, 4,
                     out, error);
}

TEST(Args, AcceptedAndRejectedForms) {
    ParsedArgs a;
    std::string error;
    ASSERT_TRUE(parse({"-e", "403", "in1.png", "--output=out", "-v", "--thumb", "64", "in2.jpg"},
                      &a, &error))
        << error;
    EXPECT_EQ("403 out 64 1", a.get("effect") + " " + a.get("output") + " " + a.get("thumb") + " " +
                                  std::to_string(a.has("verbose")));
    EXPECT_EQ(std::vector<std::string>({"in1.png", "in2.jpg"}), a.positionals);
    // The last value wins; after "--" everything is a file name; a value may
    // itself start with a dash.
    ParsedArgs b;
    ASSERT_TRUE(parse({"-eSepia", "-e", "Negative", "--", "-v", "-"}, &b, &error));
    EXPECT_EQ("Negative", b.get("effect"));
    EXPECT_FALSE(b.has("verbose"));
    EXPECT_EQ(std::vector<std::string>({"-v", "-"}), b.positionals);
    EXPECT_EQ("fallback", b.get("output", "fallback"));
    ParsedArgs c;
    ASSERT_TRUE(parse({"-e", "-1"}, &c, &error));
    EXPECT_EQ("-1", c.get("effect"));
    const struct {
        std::vector<const char*> argv;
        const char* message;
    } rejected[] = {
        {{"-x"}, "unknown option '-x'"},
        {{"--nope"}, "unknown option '--nope'"},
        {{"--nope=1"}, "unknown option '--nope'"},
        {{"-e"}, "option '--effect' needs a value"},
        {{"in.png", "--output"}, "option '--output' needs a value"},
        {{"--verbose=yes"}, "option '--verbose' takes no value"},
        {{"-vx"}, "option '-v' takes no value"},
    };
    for (const auto& r : rejected) {
        ParsedArgs d;
        EXPECT_FALSE(parse(r.argv, &d, &error)) << r.message;
        EXPECT_EQ(r.message, error);
    }
}

TEST(Args, NumbersAndSizes) {
    int v = -7;
    EXPECT_TRUE(parseInt("98", 1, 100, &v) && v == 98);
    EXPECT_TRUE(parseInt("-5", -10, 10, &v) && v == -5);
    v = 42;
    for (const char* bad : {"101", "0", "12abc", ""})
        EXPECT_FALSE(parseInt(bad, 1, 100, &v)) << bad;
    EXPECT_FALSE(parseInt("99999999999999999999", 1, 2147483647, &v));
    EXPECT_EQ(42, v);  // untouched on failure
    int w = 0, h = 0;
    EXPECT_TRUE(parseSize("640x480", 64, 8192, &w, &h) && w == 640 && h == 480);
    EXPECT_TRUE(parseSize("100X64", 64, 8192, &w, &h) && h == 64);
    for (const char* bad : {"640", "640x", "63x100", "640x480x2"})
        EXPECT_FALSE(parseSize(bad, 64, 8192, &w, &h)) << bad;
}

TEST(Progress, LineAndBar) {
    const std::string dots = std::string(30, '.');
    EXPECT_EQ("[" + dots + "] 0/4  a.png", progressLine(0, 4, "a.png"));
    EXPECT_EQ("[" + std::string(15, '#') + std::string(15, '.') + "] 2/4  b",
              progressLine(2, 4, "b"));
    // 9 of 30 cells for 3/10; the count is right-aligned to the width of "10/10".
    EXPECT_EQ("[" + std::string(9, '#') + std::string(21, '.') + "]  3/10",
              progressLine(3, 10, ""));
    EXPECT_EQ("[" + std::string(30, '#') + "] 10/10", progressLine(12, 10, nullptr));
    EXPECT_EQ("[" + dots + "] 0/1", progressLine(-3, 0, ""));
    // Long names keep their end, where the file name is.
    std::string longName = std::string(20, 'd') + "/" + std::string(29, 'f') + ".png";
    std::string line = progressLine(1, 1, longName.c_str());
    EXPECT_EQ("..." + longName.substr(longName.size() - 37), line.substr(line.size() - 40));
    // Drawn only when enabled, redrawn in place: a shorter line blanks the
    // first one's tail; the destructor ends the line.
    char* text = nullptr;
    size_t size = 0;
    FILE* out = open_memstream(&text, &size);
    ASSERT_NE(nullptr, out);
    ProgressBar(out, 3, false).update(1, "x");
    {
        ProgressBar bar(out, 2, true);
        bar.update(0, "long-name.png");
        bar.update(1, "b");
    }
    fclose(out);
    std::string got(text, size);
    free(text);
    const std::string first = progressLine(0, 2, "long-name.png"), second = progressLine(1, 2, "b");
    EXPECT_EQ("\r" + first + "\r" + second + std::string(first.size() - second.size(), ' ') + "\n",
              got);
}

// Error reports count as failures, from the image core's report function and
// from the Android log; error-level diagnostics and quieter reports do not.
TEST(CliLog, CountsErrorReportsOnly) {
    for (const char* report : {"VC_ERROR_UNKNOWN (-1): core/VFilterBufferedProcessorImpl:210",
                               "VC_ERROR_INVALID_STATE (-7): core/egl/EglImage:88"})
        EXPECT_TRUE(cliLogIsErrorReport(report)) << report;
    for (const char* other :
         {"EGL: lockGraphicBuffer format : 1, width : 960, stride : 960",
          "Input format 'NV21' is not a native format for EglImage: Conversion required to RGBA",
          "VC_ERROR_UNKNOWN", "  VC_ERROR_UNKNOWN (-1): x:1", ""})
        EXPECT_FALSE(cliLogIsErrorReport(other)) << other;
    EXPECT_FALSE(cliLogIsErrorReport(nullptr));
    cliLogSetup(false);
    const int before = cliLogErrorCount();
    VCError_report(VC_ERROR_IO_FAILED, "vccore/src/vc_image", 12);
    __android_log_print(ANDROID_LOG_ERROR, "KivImaging::EGL", "%s (%d): %s:%d",
                        "VC_ERROR_INVALID_STATE", -7, "core/VFilterBufferedProcessorImpl", 99);
    __android_log_print(ANDROID_LOG_ERROR, "KivImaging::EGL", "EGL: lockGraphicBuffer format : %x",
                        1);
    VF_LogMsg(VF_LOG_ERROR, "Encoding failed (%dx%d %4.4s)", 4, 4, "RGBA");
    VF_LogMsg(VF_LOG_DEBUG, "VC_ERROR_UNKNOWN (-1): %s:%d", "x", 1);
    __android_log_print(ANDROID_LOG_WARN, "KivImaging::EGL", "VC_ERROR_UNKNOWN (-1): x:1");
    EXPECT_EQ(before + 2, cliLogErrorCount());
}

TEST(LiveStats, IntervalsOfFramesThatFollowEachOtherAndTheSummaryLine) {
    LiveStats stats(2);
    // Frames 1-2 start no interval; 4 follows a frame the window dropped.
    const struct {
        uint64_t number;
        int64_t ms;
    } frames[] = {{1, 0}, {2, 1}, {3, 42}, {4, 83}, {6, 200}, {7, 240}, {8, 290}};
    for (const auto& f : frames) stats.add(f.number, f.ms * 1000000);
    EXPECT_EQ(stats.frames(), 7u);
    EXPECT_DOUBLE_EQ(stats.percentile(50), 41.0);  // of 41, 40, 41, 50
    EXPECT_DOUBLE_EQ(stats.percentile(99), 50.0);
    EXPECT_DOUBLE_EQ(LiveStats(0).percentile(50), 0.0);
    EXPECT_EQ(liveSummary(240, 3, 41.04, 43.96, 237, "out.mp4"),
              "frames: 240 rendered, 3 dropped; interval p50 41.0 ms, p99 44.0 ms; recorded 237 "
              "frames to out.mp4");
    EXPECT_EQ(liveSummary(5, 0, 0, 0, 0, ""),
              "frames: 5 rendered, 0 dropped; interval p50 0.0 ms, p99 0.0 ms");
}

}  // namespace
