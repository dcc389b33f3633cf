// The host video library's entry. The library is built with hidden symbols
// and carries its own VF_LogMsg and VCError_report, which hand every message
// to the loading program's, so its log lines land where the program's do.
extern "C" {
#include <libavutil/log.h>
}

#include <stdarg.h>
#include <stdio.h>

#include "host/media/HostVideoLibrary.h"
#include "vccore/vc_error.h"

namespace kivhost {
VirtualCameraSource* VideoSource_open(const char* path, int width, int height, bool loop);
Mp4VideoWriter* FfmpegMp4Writer_create();
}  // namespace kivhost

namespace {

VF_LogMsg_t* gHostLog = nullptr;
int (*gHostReport)(int, const char*, int) = nullptr;

void forwardLog(int level, const char* format, ...) {
    char line[1024];
    va_list args;
    va_start(args, format);
    vsnprintf(line, sizeof(line), format, args);
    va_end(args);
    (*gHostLog)(level, "%s", line);
}

void setVerbose(bool verbose) {
    av_log_set_level(verbose ? AV_LOG_INFO : AV_LOG_ERROR);
}

const kivhost::HostVideoCalls kCalls = {kivhost::VideoSource_open, kivhost::FfmpegMp4Writer_create,
                                        setVerbose};

}  // namespace

VF_LogMsg_t VF_LogMsg = forwardLog;

int VCError_report(int code, const char* source, int line) {
    return gHostReport(code, source, line);
}

extern "C" __attribute__((visibility("default"))) const kivhost::HostVideoCalls* KivHostVideo_calls(
    int version, VF_LogMsg_t* log, int (*report)(int, const char*, int)) {
    if (version != KIV_HOST_VIDEO_VERSION || log == nullptr || report == nullptr) return nullptr;
    gHostLog = log;
    gHostReport = report;
    return &kCalls;
}
