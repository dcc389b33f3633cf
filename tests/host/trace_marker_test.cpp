// The host's trace marker reaches the image core before main(): the ftrace
// marker when writable, else the file KIV_TRACE_FILE names, resolved once.
#include "kivplatform/trace_marker.h"

#include <gtest/gtest.h>
#include <stdlib.h>
#include <unistd.h>

#include <fstream>
#include <sstream>
#include <string>

#include "vccore/vc_log.h"

TEST(HostTraceMarker, ImageCoreTracesIntoTheFileResolvedOnce) {
    EXPECT_EQ(reinterpret_cast<void*>(VF_TraceMarker),
              reinterpret_cast<void*>(KivPlatform_traceMarkerFd));
    if (access("/sys/kernel/tracing/trace_marker", W_OK) == 0 ||
        access("/sys/kernel/debug/tracing/trace_marker", W_OK) == 0) {
        GTEST_SKIP() << "the ftrace marker is writable here and takes precedence";
    }
    char path[] = "/tmp/kiv_trace_XXXXXX";
    int fd = mkstemp(path);
    ASSERT_GE(fd, 0);
    close(fd);
    setenv("KIV_TRACE_FILE", path, 1);
    { VFTraceSection section("KI-onDrawFrame"); }
    unsetenv("KIV_TRACE_FILE");  // already resolved: tracing goes on into the file
    VF_TraceBegin("KI-render");
    std::stringstream all;
    all << std::ifstream(path).rdbuf();
    const std::string pid = std::to_string(getpid());
    EXPECT_EQ("B|" + pid + "|KI-onDrawFrameEB|" + pid + "|KI-render", all.str());
    unlink(path);
}
