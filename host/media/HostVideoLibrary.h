// The host's video library (libkivhostvideo.so): FFmpeg behind a few calls.
// It is opened with dlopen the first time a program reads or writes video,
// so that everything else (the library, `kivimaging apply`) starts without
// loading FFmpeg and the hundred-odd libraries it pulls in.
#ifndef KIV_HOST_MEDIA_HOSTVIDEOLIBRARY_H
#define KIV_HOST_MEDIA_HOSTVIDEOLIBRARY_H

#include "kivhost/VirtualCamera.h"
#include "Mp4VideoWriter.h"
#include "vccore/vc_log.h"

#define KIV_HOST_VIDEO_LIBRARY "libkivhostvideo.so"
#define KIV_HOST_VIDEO_ENTRY "KivHostVideo_calls"

namespace kivhost {

struct HostVideoCalls {
    // See VirtualCamera_video; null when the file cannot be opened (logged).
    VirtualCameraSource* (*openVideo)(const char* path, int width, int height, bool loop);
    Mp4VideoWriter* (*newWriter)();
    // FFmpeg's own messages: errors only, or its information too.
    void (*setVerbose)(bool verbose);
};

// The library's calls, loaded once per process; null when it cannot be
// loaded (logged once).
const HostVideoCalls* HostVideo_calls();
// For tests: the next HostVideo_calls() loads again, from `library` only (a
// file name), or as usual when null.
void HostVideo_reloadForTesting(const char* library);

}  // namespace kivhost

// Bumped whenever HostVideoCalls or Mp4VideoWriter change.
#define KIV_HOST_VIDEO_VERSION 1

// The library's one exported function. It logs through *log, whatever the
// caller's log function is at the time, and reports errors through `report`
// (the caller's VCError_report). Null for another version.
extern "C" const kivhost::HostVideoCalls* KivHostVideo_calls(int version, VF_LogMsg_t* log,
                                                             int (*report)(int, const char*, int));
typedef const kivhost::HostVideoCalls* (*KivHostVideo_calls_t)(int, VF_LogMsg_t*,
                                                               int (*)(int, const char*, int));

#endif
