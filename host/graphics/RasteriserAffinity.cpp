#include "host/graphics/RasteriserAffinity.h"

#include <dirent.h>
#include <errno.h>
#include <fcntl.h>
#include <sched.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#include <vector>

#include "vccore/vc_log.h"

namespace android {

namespace {

const char kPrefix[] = "llvmpipe-";

// The rasteriser number of task `tid`, or -1 for another thread.
int rasteriserNumber(const char* tid) {
    char path[300];
    snprintf(path, sizeof(path), "/proc/self/task/%s/comm", tid);
    const int fd = open(path, O_RDONLY | O_CLOEXEC);
    if (fd < 0) return -1;
    char name[32] = {};
    const ssize_t n = read(fd, name, sizeof(name) - 1);
    close(fd);
    const size_t prefix = sizeof(kPrefix) - 1;
    if (n <= (ssize_t)prefix || strncmp(name, kPrefix, prefix) != 0) return -1;
    char* end = nullptr;
    const long number = strtol(name + prefix, &end, 10);
    return end != name + prefix && (*end == '\n' || *end == '\0') && number >= 0 ? (int)number
                                                                                 : -1;
}

}  // namespace

int RasteriserAffinity_apply() {
    const char* setting = getenv("KIV_HOST_RASTERISER_AFFINITY");
    if (setting != nullptr && strcmp(setting, "0") == 0) return 0;
    cpu_set_t allowed;
    if (sched_getaffinity(0, sizeof(allowed), &allowed) != 0) return 0;
    std::vector<int> cores;
    for (int cpu = 0; cpu < CPU_SETSIZE; ++cpu) {
        if (CPU_ISSET(cpu, &allowed)) cores.push_back(cpu);
    }
    if (cores.size() < 2) return 0;
    DIR* tasks = opendir("/proc/self/task");
    if (tasks == nullptr) return 0;
    int placed = 0, refused = 0, error = 0;
    while (dirent* entry = readdir(tasks)) {
        if (entry->d_name[0] == '.') continue;
        const int number = rasteriserNumber(entry->d_name);
        if (number < 0) continue;
        cpu_set_t one;
        CPU_ZERO(&one);
        CPU_SET(cores[(size_t)number % cores.size()], &one);
        if (sched_setaffinity((pid_t)atoi(entry->d_name), sizeof(one), &one) == 0) {
            ++placed;
        } else {
            ++refused;
            error = errno;
        }
    }
    closedir(tasks);
    if (refused > 0) {
        VF_LogMsg(VF_LOG_WARNING, "Host GL: %d rasteriser thread(s) keep every core: %s", refused,
                  strerror(error));
    }
    return placed;
}

}  // namespace android
