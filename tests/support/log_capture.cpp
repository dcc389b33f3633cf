#include "support/log_capture.h"

#include <stdarg.h>
#include <stdio.h>

#include <algorithm>
#include <mutex>

#include "vccore/vc_log.h"

namespace {

std::mutex gLock;
std::vector<LoggedLine> gLines;

void captureLogMsg(int level, const char* format, ...) {
    char buf[4096];
    va_list args;
    va_start(args, format);
    vsnprintf(buf, sizeof(buf), format, args);
    va_end(args);
    std::lock_guard<std::mutex> guard(gLock);
    gLines.push_back({level, buf});
}

}  // namespace

LogCapture::LogCapture() : mPrevious(reinterpret_cast<void*>(VF_LogMsg)) {
    clear();
    VF_LogMsg = captureLogMsg;
}

LogCapture::~LogCapture() {
    VF_LogMsg = reinterpret_cast<VF_LogMsg_t>(mPrevious);
}

std::vector<LoggedLine> LogCapture::lines() const {
    std::lock_guard<std::mutex> guard(gLock);
    return gLines;
}

std::vector<std::string> LogCapture::texts() const {
    std::vector<std::string> out;
    for (const LoggedLine& l : lines()) out.push_back(l.text);
    return out;
}

bool LogCapture::contains(const std::string& text) const {
    return count(text) > 0;
}

bool LogCapture::contains(int level, const std::string& text) const {
    for (const LoggedLine& l : lines())
        if (l.level == level && l.text == text) return true;
    return false;
}

size_t LogCapture::count(const std::string& text) const {
    auto all = lines();
    return std::count_if(all.begin(), all.end(),
                         [&](const LoggedLine& l) { return l.text == text; });
}

size_t LogCapture::countPrefix(const std::string& prefix, int level) const {
    auto all = lines();
    return std::count_if(all.begin(), all.end(), [&](const LoggedLine& l) {
        return (level < 0 || l.level == level) && l.text.rfind(prefix, 0) == 0;
    });
}

namespace {

struct ExpectedLine {
    int level;
    std::string text;
};

bool lineMatches(const ExpectedLine& want, const LoggedLine& got) {
    if (want.level != got.level) return false;
    const std::string& t = want.text;
    if (!t.empty() && t.back() == '*')
        return got.text.compare(0, t.size() - 1, t, 0, t.size() - 1) == 0;
    if (t.size() < 2 || t.compare(t.size() - 2, 2, ":#") != 0) return t == got.text;
    const size_t head = t.size() - 1;
    return got.text.size() > head && got.text.compare(0, head, t, 0, head) == 0 &&
           got.text.find_first_not_of("0123456789", head) == std::string::npos;
}

}  // namespace

::testing::AssertionResult LogCapture::matches(const std::vector<std::string>& lines) const {
    std::vector<ExpectedLine> expected;
    for (const std::string& e : lines)
        expected.push_back({static_cast<int>(std::string("VDIWE").find(e[0])), e.substr(2)});
    const std::vector<LoggedLine> all = this->lines();
    std::vector<LoggedLine> loud;
    for (const LoggedLine& l : all)
        if (l.level >= 3) loud.push_back(l);
    auto dump = [&]() {
        std::string text = "\n  logged:";
        for (const LoggedLine& l : all) text += "\n    " + std::to_string(l.level) + " " + l.text;
        return text;
    };
    size_t next = 0;
    for (const ExpectedLine& want : expected) {
        if (want.level >= 3) {
            if (next >= loud.size() || !lineMatches(want, loud[next]))
                return ::testing::AssertionFailure()
                       << "expected " << want.level << " " << want.text << dump();
            ++next;
        } else if (std::none_of(all.begin(), all.end(),
                                [&](const LoggedLine& l) { return lineMatches(want, l); })) {
            return ::testing::AssertionFailure()
                   << "missing " << want.level << " " << want.text << dump();
        }
    }
    if (next != loud.size())
        return ::testing::AssertionFailure() << "unexpected " << loud[next].text << dump();
    return ::testing::AssertionSuccess();
}

void LogCapture::clear() {
    std::lock_guard<std::mutex> guard(gLock);
    gLines.clear();
}

void LogCapture_expectRows(const std::vector<LogRow>& rows) {
    for (size_t i = 0; i < rows.size(); ++i) {
        LogCapture log;
        EXPECT_EQ(rows[i].status, rows[i].call()) << "row " << i;
        EXPECT_TRUE(log.matches(rows[i].lines)) << "row " << i;
    }
}
