#include "kivplatform/trace_marker.h"

#include <fcntl.h>
#include <stdlib.h>
#include <unistd.h>

#include "vccore/vc_log.h"

namespace {

int openMarker() {
    static const char* const kFtraceMarkers[] = {
        "/sys/kernel/tracing/trace_marker",
        "/sys/kernel/debug/tracing/trace_marker",
    };
    for (const char* path : kFtraceMarkers) {
        int fd = open(path, O_WRONLY | O_CLOEXEC);
        if (fd >= 0) return fd;
    }
    const char* file = getenv("KIV_TRACE_FILE");
    if (file != nullptr && file[0] != '\0') {
        return open(file, O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0644);
    }
    return -1;
}

// The image core's trace records go to the host's marker in every program
// that links the host layer (which links this file whole for that reason),
// before main() and so before any thread.
[[maybe_unused]] const bool gInstalled = (VF_TraceMarker = KivPlatform_traceMarkerFd, true);

}  // namespace

extern "C" int KivPlatform_traceMarkerFd(void) {
    static const int fd = openMarker();
    return fd;
}
