// Logging, timing probes and system-trace markers of the image core.
#ifndef VCCORE_VC_LOG_H
#define VCCORE_VC_LOG_H

#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

// Severity levels: the first argument of every log call.
#define VF_LOG_VERBOSE 0
#define VF_LOG_DEBUG 1
#define VF_LOG_INFO 2
#define VF_LOG_WARNING 3
#define VF_LOG_ERROR 4

typedef void (*VF_LogMsg_t)(int level, const char* format, ...);

// The current logging function. Starts as AndroidLogMsg; set it once, before
// other threads start.
extern VF_LogMsg_t VF_LogMsg;

// Prints "<label> <message>\n" to standard output, then sends the message to
// the Android log with tag "kivcamera".
void AndroidLogMsg(int level, const char* format, ...) __attribute__((format(printf, 2, 3)));

// The standard-output half of AndroidLogMsg only.
void DefaultLogMsg(int level, const char* format, ...) __attribute__((format(printf, 2, 3)));

// Label ("[V]" … "[E]") and Android priority of a level; levels above 4 are verbose.
const char* VF_LogLabel(int level);
int VF_LogPriority(int level);

// System trace sections: "B|<pid>|<name>" and "E" on the platform trace marker.
void VF_TraceBegin(const char* name);
void VF_TraceEnd(void);

// The platform trace marker: a function giving the file descriptor that trace
// records are written to, or -1 while tracing is off. The image core knows no
// platform of its own: until the platform layer (or an embedding program)
// points this elsewhere, it gives -1. Set it once, before other threads start.
typedef int (*VF_TraceMarker_t)(void);
extern VF_TraceMarker_t VF_TraceMarker;

#ifdef __cplusplus
}  // extern "C"

// Scoped timing probe: logs an entry line (optionally) and, on destruction,
// the elapsed time.
class TimeStat {
public:
    TimeStat(const char* name, bool logEntry);
    TimeStat(const char* tag, const char* name, int line, bool logEntry);
    ~TimeStat();

    // Microseconds since the start; also records that moment as the stop time.
    int32_t operator()();
    // Records the stop time and logs the elapsed whole milliseconds with a label.
    void TimeStamp(const char* label);

    int64_t mStartTime;
    int64_t mStopTime;
    const char* mName;
    const char* mTag;
    int32_t mLine;

    TimeStat(const TimeStat&) = delete;
    TimeStat& operator=(const TimeStat&) = delete;
};

// Scoped trace section.
class VFTraceSection {
public:
    explicit VFTraceSection(const char* name) { VF_TraceBegin(name); }
    ~VFTraceSection() { VF_TraceEnd(); }
    VFTraceSection(const VFTraceSection&) = delete;
    VFTraceSection& operator=(const VFTraceSection&) = delete;
};
#endif

#endif
