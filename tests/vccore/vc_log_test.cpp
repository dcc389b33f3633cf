// Logging entry, level table, timing probe lines and trace markers.
#include <android/log.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <unistd.h>

#include <fstream>
#include <regex>
#include <sstream>
#include <string>
#include <vector>

#include "support/log_capture.h"
#include "vccore/vc_log.h"

namespace {

std::string readFile(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    std::stringstream ss;
    ss << in.rdbuf();
    return ss.str();
}

struct SentMessage {
    int priority;
    std::string tag;
    std::string message;
};
std::vector<SentMessage> gSent;

void recordLogger(const struct __android_logger_data* data, const char* message) {
    gSent.push_back({data->priority, data->tag != nullptr ? data->tag : "", message});
}

bool matches(const std::string& text, const char* pattern) {
    return std::regex_match(text, std::regex(pattern));
}

}  // namespace

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

    // Unknown levels print as verbose; verbose and debug both go out at debug priority.
    ASSERT_EQ(6u, gSent.size());
    const int priorities[] = {ANDROID_LOG_DEBUG, ANDROID_LOG_ERROR, ANDROID_LOG_INFO,
                              ANDROID_LOG_WARN,  ANDROID_LOG_DEBUG, ANDROID_LOG_DEBUG};
    const char* messages[] = {"value 42 of x", "broken", "info", "warn", "verbose", "debug"};
    for (size_t i = 0; i < gSent.size(); ++i) {
        EXPECT_EQ(priorities[i], gSent[i].priority) << i;
        EXPECT_EQ("kivcamera", gSent[i].tag);
        EXPECT_EQ(messages[i], gSent[i].message);
    }

    gSent.clear();
    testing::internal::CaptureStdout();
    DefaultLogMsg(VF_LOG_WARNING, "only %s", "stdout");
    EXPECT_EQ("[W] only stdout\n", testing::internal::GetCapturedStdout());
    EXPECT_TRUE(gSent.empty());

    // Long lines reach standard output whole (the Android log has its own
    // limit on the host's log library; it gets the message once).
    const std::string longText = std::string(3000, 'a') + "|" + std::string(3000, 'b');
    testing::internal::CaptureStdout();
    AndroidLogMsg(VF_LOG_INFO, "%s end", longText.c_str());
    const std::string printed = testing::internal::GetCapturedStdout();
    EXPECT_TRUE(printed == "[I] " + longText + " end\n") << printed.size() << " bytes";
    EXPECT_EQ(1u, gSent.size());
    __android_log_set_logger(__android_log_stderr_logger);
}

TEST(VcLog, TimeStatLines) {
    LogCapture log;
    // The probes are backdated; the patterns leave the time between the
    // backdating and the destructor some hundreds of microseconds, which a
    // loaded or sanitised run can take.
    {
        TimeStat probe("decode", true);
        EXPECT_EQ(nullptr, probe.mTag);
        EXPECT_EQ(-1, probe.mLine);
        probe.mStartTime -= 4200;
    }
    {
        TimeStat probe("tagA", "encode", 77, true);
        probe.mStartTime -= 12300;
    }
    {
        TimeStat probe("tagB", "under", 5, false);
        probe.mStartTime -= 4000;  // 1000 µs below the threshold: fractional form
    }
    {
        TimeStat probe("tagB", "over", 6, false);
        probe.mStartTime -= 5001;  // past the threshold whatever the delay: whole milliseconds
    }
    auto lines = log.lines();
    ASSERT_EQ(6u, lines.size());
    EXPECT_EQ("[kivcamera] decode: Entry", lines[0].text);
    EXPECT_TRUE(matches(lines[1].text, R"(\[\(null\)\] decode\(-1\): Exit \(4\.[2-9]\d\dms\))"))
        << lines[1].text;
    EXPECT_EQ("[tagA] encode:77: Entry", lines[2].text);
    EXPECT_EQ("[tagA] encode(77): Exit (12ms)", lines[3].text);
    EXPECT_TRUE(matches(lines[4].text, R"(\[tagB\] under\(5\): Exit \((4\.\d\d\d|5\.000)ms\))"))
        << lines[4].text;
    EXPECT_TRUE(matches(lines[5].text, R"(\[tagB\] over\(6\): Exit \([5-9]ms\))")) << lines[5].text;
    for (const auto& l : lines) EXPECT_EQ(VF_LOG_DEBUG, l.level);
}

TEST(VcLog, TimeStatStampAndElapsed) {
    LogCapture log;
    {
        TimeStat probe(nullptr, false);  // a probe named null logs nothing at all
        probe.mStartTime -= 3000;
        int32_t us = probe();
        EXPECT_GE(us, 3000);
        EXPECT_LT(us, 3000 + 1000000);
        EXPECT_EQ(probe.mStopTime - probe.mStartTime, us);
    }
    EXPECT_TRUE(log.lines().empty());
    {
        TimeStat probe("jpeg", false);
        probe.mStartTime -= 25400;
        probe.TimeStamp("encoded");
    }
    auto lines = log.lines();
    ASSERT_EQ(2u, lines.size());
    EXPECT_EQ("[jpeg] encoded: 25ms", lines[0].text);
    EXPECT_EQ("[(null)] jpeg(-1): Exit (25ms)", lines[1].text);
}

namespace {
int gTraceFd = -1;
int testMarker() {
    return gTraceFd;
}
}  // namespace

TEST(VcLog, TraceRecordsGoToTheMarkerTheHookGives) {
    // Without a platform layer the image core traces nowhere, and nothing fails.
    ASSERT_EQ(-1, VF_TraceMarker());
    VF_TraceBegin("KI-nowhere");
    VF_TraceEnd();

    char path[] = "/tmp/kiv_trace_XXXXXX";
    gTraceFd = mkstemp(path);
    ASSERT_GE(gTraceFd, 0);
    VF_TraceMarker_t previous = VF_TraceMarker;
    VF_TraceMarker = testMarker;
    VF_TraceBegin("KI-render");
    VF_TraceEnd();
    { VFTraceSection section("KI-onDrawFrame"); }
    std::string longName(3000, 'n');
    VF_TraceBegin(longName.c_str());
    VF_TraceMarker = previous;
    close(gTraceFd);

    std::string expected = "B|" + std::to_string(getpid()) + "|KI-render" + "E" + "B|" +
                           std::to_string(getpid()) + "|KI-onDrawFrame" + "E";
    std::string all = readFile(path);
    ASSERT_GE(all.size(), expected.size());
    EXPECT_EQ(expected, all.substr(0, expected.size()));
    // Records are formatted into a 1024-byte buffer: long names are cut.
    EXPECT_EQ(1023u, all.size() - expected.size());
    unlink(path);
}
