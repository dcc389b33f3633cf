// Captures what the library logs through VF_LogMsg, for exact-line checks.
#ifndef KIV_TESTS_LOG_CAPTURE_H
#define KIV_TESTS_LOG_CAPTURE_H

#include <gtest/gtest.h>

#include <functional>
#include <string>
#include <vector>

#include "vccore/vc_log.h"

struct LoggedLine {
    int level;
    std::string text;
};

// Installs a capturing VF_LogMsg for its lifetime and restores the previous one.
class LogCapture {
public:
    LogCapture();
    ~LogCapture();

    std::vector<LoggedLine> lines() const;
    std::vector<std::string> texts() const;
    bool contains(const std::string& text) const;
    bool contains(int level, const std::string& text) const;
    size_t count(const std::string& text) const;
    // Lines starting with prefix (at that level, unless level is negative):
    // for lines that end in a source line number, which moves with edits.
    size_t countPrefix(const std::string& prefix, int level = -1) const;
    void clear();
    // Success when the warnings and errors logged are exactly the expected
    // ones of those levels, in order, and each expected line of a lower level
    // was logged too. Each is written "<level letter> <text>" (V, D, I, W or
    // E); a text ending in ":#" stands for any source line number there, as
    // error reports end ("E VC_ERROR_NULL_PARAM (-2): vccore/src/vc_image:#"); a
    // text ending in '*' is a prefix (for a system's own error text at the end).
    ::testing::AssertionResult matches(const std::vector<std::string>& expected) const;

    LogCapture(const LogCapture&) = delete;
    LogCapture& operator=(const LogCapture&) = delete;

private:
    void* mPrevious;
};

// One row of a module's table of status codes and log lines: the call, the
// status it returns and what it logs (as LogCapture::matches takes it).
struct LogRow {
    std::function<int()> call;
    int status;
    std::vector<std::string> lines;
};
// Runs each row under a capture of its own; a failure names the row's index.
void LogCapture_expectRows(const std::vector<LogRow>& rows);

#endif
