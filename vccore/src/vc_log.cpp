#include "vccore/vc_log.h"

#include <android/log.h>
#include <stdarg.h>
#include <stdio.h>
#include <stdlib.h>
#include <time.h>
#include <unistd.h>

VF_LogMsg_t VF_LogMsg = AndroidLogMsg;

namespace {

int noTraceMarker() {
    return -1;
}

const char kLogTag[] = "kivcamera";

void printToStdout(int level, const char* format, va_list args) {
    // Formatted in full first (on the heap when it outgrows the stack buffer),
    // then written by one call so that lines of different threads do not
    // interleave.
    char buffer[2048];
    va_list again;
    va_copy(again, args);
    int n = vsnprintf(buffer, sizeof(buffer), format, args);
    char* message = buffer;
    if (n >= static_cast<int>(sizeof(buffer))) {
        message = static_cast<char*>(malloc(static_cast<size_t>(n) + 1));
        if (message != nullptr)
            vsnprintf(message, static_cast<size_t>(n) + 1, format, again);
        else
            message = buffer;  // out of memory: the cut line is better than none
    }
    va_end(again);
    if (n >= 0) {
        fprintf(stdout, "%s %s\n", VF_LogLabel(level), message);
        fflush(stdout);
    }
    if (message != buffer) free(message);
}

// Monotonic elapsed time in microseconds (read in nanoseconds, divided by 1000).
int64_t elapsedMicros() {
    struct timespec ts;
    clock_gettime(CLOCK_BOOTTIME, &ts);
    int64_t ns = static_cast<int64_t>(ts.tv_sec) * 1000000000LL + ts.tv_nsec;
    return ns / 1000;
}

}  // namespace

VF_TraceMarker_t VF_TraceMarker = noTraceMarker;

extern "C" const char* VF_LogLabel(int level) {
    switch (level) {
        case VF_LOG_DEBUG:
            return "[D]";
        case VF_LOG_INFO:
            return "[I]";
        case VF_LOG_WARNING:
            return "[W]";
        case VF_LOG_ERROR:
            return "[E]";
        default:
            return "[V]";
    }
}

extern "C" int VF_LogPriority(int level) {
    switch (level) {
        case VF_LOG_INFO:
            return ANDROID_LOG_INFO;
        case VF_LOG_WARNING:
            return ANDROID_LOG_WARN;
        case VF_LOG_ERROR:
            return ANDROID_LOG_ERROR;
        default:
            return ANDROID_LOG_DEBUG;
    }
}

extern "C" void DefaultLogMsg(int level, const char* format, ...) {
    va_list args;
    va_start(args, format);
    printToStdout(level, format, args);
    va_end(args);
}

extern "C" void AndroidLogMsg(int level, const char* format, ...) {
    va_list args;
    va_start(args, format);
    va_list copy;
    va_copy(copy, args);
    printToStdout(level, format, args);
    __android_log_vprint(VF_LogPriority(level), kLogTag, format, copy);
    va_end(copy);
    va_end(args);
}

extern "C" void VF_TraceBegin(const char* name) {
    int fd = VF_TraceMarker();
    if (fd < 0) return;
    char buf[1024];
    int n = snprintf(buf, sizeof(buf), "B|%d|%s", getpid(), name != nullptr ? name : "");
    if (n < 0) return;
    if (n >= static_cast<int>(sizeof(buf))) n = sizeof(buf) - 1;
    ssize_t ignored = write(fd, buf, n);
    (void)ignored;
}

extern "C" void VF_TraceEnd(void) {
    int fd = VF_TraceMarker();
    if (fd < 0) return;
    ssize_t ignored = write(fd, "E", 1);
    (void)ignored;
}

TimeStat::TimeStat(const char* name, bool logEntry)
    : mStartTime(elapsedMicros()), mStopTime(0), mName(name), mTag(nullptr), mLine(-1) {
    if (logEntry) VF_LogMsg(VF_LOG_DEBUG, "[%s] %s: Entry", kLogTag, name);
}

TimeStat::TimeStat(const char* tag, const char* name, int line, bool logEntry)
    : mStartTime(elapsedMicros()), mStopTime(0), mName(name), mTag(tag), mLine(line) {
    if (logEntry) VF_LogMsg(VF_LOG_DEBUG, "[%s] %s:%d: Entry", tag, name, line);
}

int32_t TimeStat::operator()() {
    mStopTime = elapsedMicros();
    return static_cast<int32_t>(mStopTime - mStartTime);
}

void TimeStat::TimeStamp(const char* label) {
    mStopTime = elapsedMicros();
    VF_LogMsg(VF_LOG_DEBUG, "[%s] %s: %ldms", mName, label,
              static_cast<long>((mStopTime - mStartTime) / 1000));
}

TimeStat::~TimeStat() {
    mStopTime = elapsedMicros();
    if (mName == nullptr) return;
    int64_t elapsed = mStopTime - mStartTime;
    // glibc prints a null %s as "(null)"; probes made with the one-name
    // constructor print their tag that way.
    if (elapsed <= 5000) {
        VF_LogMsg(VF_LOG_DEBUG, "[%s] %s(%d): Exit (%0.3fms)", mTag, mName, mLine,
                  static_cast<double>(static_cast<float>(elapsed) / 1000.0f));
    } else {
        VF_LogMsg(VF_LOG_DEBUG, "[%s] %s(%d): Exit (%ldms)", mTag, mName, mLine,
                  static_cast<long>(elapsed / 1000));
    }
}
