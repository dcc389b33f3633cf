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

void LogCapture::clear() {
    std::lock_guard<std::mutex> guard(gLock);
    gLines.clear();
}
