// Captures the system-trace sections the library writes (for exact trace
// labels): the image core's trace marker points at a memory file for the
// capture's lifetime. Not while other threads trace.
#ifndef KIV_TESTS_SUPPORT_TRACE_CAPTURE_H
#define KIV_TESTS_SUPPORT_TRACE_CAPTURE_H

#include <sys/mman.h>
#include <unistd.h>

#include <string>

#include "vccore/vc_log.h"

class TraceCapture {
public:
    TraceCapture() : mPrevious(VF_TraceMarker) {
        sFd = memfd_create("kiv-trace", 0);
        VF_TraceMarker = [] { return sFd; };
    }
    ~TraceCapture() {
        VF_TraceMarker = mPrevious;
        close(sFd);
        sFd = -1;
    }
    std::string text() const {
        std::string all;
        char buf[4096];
        ssize_t n;
        for (off_t at = 0; (n = pread(sFd, buf, sizeof(buf), at)) > 0; at += n) all.append(buf, n);
        return all;
    }
    // Sections opened with exactly this label.
    size_t count(const std::string& label) const {
        const std::string all = text(), begin = "|" + label;
        size_t n = 0;
        for (size_t at = all.find(begin); at != std::string::npos; at = all.find(begin, at + 1)) {
            const size_t end = at + begin.size();
            n += end == all.size() || all[end] == 'E' || all[end] == 'B' ? 1 : 0;
        }
        return n;
    }
    void clear() {
        ftruncate(sFd, 0);
        lseek(sFd, 0, SEEK_SET);
    }
    TraceCapture(const TraceCapture&) = delete;
    TraceCapture& operator=(const TraceCapture&) = delete;

private:
    static inline int sFd = -1;
    VF_TraceMarker_t mPrevious;
};

#endif
