#include "HostVideoLibrary.h"

#include <dlfcn.h>
#include <limits.h>
#include <stdlib.h>
#include <unistd.h>

#include <atomic>
#include <mutex>
#include <string>
#include <vector>

#include "kivhost/VideoEncoder.h"
#include "vccore/vc_error.h"

namespace kivhost {

namespace {

std::atomic<bool> gVerbose{false};
std::mutex gLoadLock;
const HostVideoCalls* gCalls = nullptr;
bool gTried = false;
std::string gOnlyName;  // tests

// The folder of the program or library this code is linked into.
std::string ownFolder() {
    Dl_info info;
    std::string path;
    if (dladdr(reinterpret_cast<void*>(&HostVideo_calls), &info) != 0 && info.dli_fname != nullptr)
        path = info.dli_fname;
    char resolved[PATH_MAX];
    // The main program may be named without a folder.
    if (path.find('/') == std::string::npos) {
        const ssize_t n = readlink("/proc/self/exe", resolved, sizeof(resolved) - 1);
        path = n > 0 ? std::string(resolved, (size_t)n) : std::string();
    } else if (realpath(path.c_str(), resolved) != nullptr) {
        path = resolved;
    }
    const size_t slash = path.rfind('/');
    return slash == std::string::npos ? std::string() : path.substr(0, slash);
}

// The folders the loader searches for the main program's libraries
// (LD_LIBRARY_PATH, its run path, the system's). A plain dlopen would search
// those of its caller, which is not us where a sanitizer wraps dlopen.
std::vector<std::string> programSearchPath() {
    std::vector<std::string> folders;
    void* program = dlopen(nullptr, RTLD_NOW);
    Dl_serinfo size;
    if (program == nullptr || dlinfo(program, RTLD_DI_SERINFOSIZE, &size) != 0) return folders;
    std::vector<char> storage(size.dls_size);
    Dl_serinfo* info = reinterpret_cast<Dl_serinfo*>(storage.data());
    *info = size;
    if (dlinfo(program, RTLD_DI_SERINFO, info) == 0) {
        for (unsigned int i = 0; i < info->dls_cnt; ++i)
            folders.push_back(info->dls_serpath[i].dls_name);
    }
    return folders;
}

// Beside this library, in the library folder seen from the program folder
// (an installed tree), then wherever the program's own libraries are found
// (the build tree's run path among them).
void* openLibrary(std::string* error) {
    std::vector<std::string> candidates;
    if (!gOnlyName.empty()) {
        candidates.push_back(gOnlyName);
    } else {
        const std::string folder = ownFolder();
        candidates.push_back(folder + "/" KIV_HOST_VIDEO_LIBRARY);
        candidates.push_back(folder + "/" KIV_HOST_VIDEO_RELATIVE_LIBDIR
                                      "/" KIV_HOST_VIDEO_LIBRARY);
        for (const std::string& dir : programSearchPath())
            candidates.push_back(dir + "/" KIV_HOST_VIDEO_LIBRARY);
    }
    *error = "not found";
    for (const std::string& name : candidates) {
        if (name.find('/') != std::string::npos && access(name.c_str(), F_OK) != 0) continue;
        void* handle = dlopen(name.c_str(), RTLD_NOW | RTLD_LOCAL);
        if (handle != nullptr) return handle;
        const char* why = dlerror();
        *error = why != nullptr ? why : name;
    }
    return nullptr;
}

}  // namespace

const HostVideoCalls* HostVideo_calls() {
    std::lock_guard<std::mutex> guard(gLoadLock);
    if (gTried) return gCalls;
    gTried = true;
    std::string error;
    // Never closed: FFmpeg keeps threads and state for the process.
    void* library = openLibrary(&error);
    auto entry = library != nullptr
                     ? reinterpret_cast<KivHostVideo_calls_t>(dlsym(library, KIV_HOST_VIDEO_ENTRY))
                     : nullptr;
    if (library != nullptr && entry == nullptr) error = "no " KIV_HOST_VIDEO_ENTRY;
    gCalls = entry != nullptr ? entry(KIV_HOST_VIDEO_VERSION, &VF_LogMsg, VCError_report) : nullptr;
    if (entry != nullptr && gCalls == nullptr) error = "another version";
    if (gCalls == nullptr) {
        VF_LogMsg(VF_LOG_ERROR, "HostVideo: no video support (%s): %s",
                  gOnlyName.empty() ? KIV_HOST_VIDEO_LIBRARY : gOnlyName.c_str(), error.c_str());
        return nullptr;
    }
    gCalls->setVerbose(gVerbose.load());
    return gCalls;
}

void HostVideo_reloadForTesting(const char* library) {
    std::lock_guard<std::mutex> guard(gLoadLock);
    gTried = false;
    gCalls = nullptr;
    gOnlyName = library != nullptr ? library : "";
}

void HostVideo_setVerbose(bool verbose) {
    gVerbose = verbose;
    std::lock_guard<std::mutex> guard(gLoadLock);
    if (gCalls != nullptr) gCalls->setVerbose(verbose);
}

std::unique_ptr<VirtualCameraSource> VirtualCamera_video(const std::string& path, int width,
                                                         int height, bool loop) {
    const HostVideoCalls* calls = HostVideo_calls();
    if (calls == nullptr) return nullptr;
    return std::unique_ptr<VirtualCameraSource>(
        calls->openVideo(path.c_str(), width, height, loop));
}

}  // namespace kivhost
