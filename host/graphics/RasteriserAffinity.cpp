#include "host/graphics/RasteriserAffinity.h"

#include <dirent.h>
#include <errno.h>
#include <fcntl.h>
#include <sched.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <time.h>
#include <unistd.h>

#include <map>
#include <vector>

#include "vccore/vc_log.h"

namespace android {

namespace {

const char kPrefix[] = "llvmpipe-";
// llvmpipe never runs more rasteriser threads than this.
const int kMaxRasterisers = 16;
// A rasteriser thread names itself once it runs, a moment after the context
// that made it exists: how long to wait for the names, and how often to look.
const long kNameWaitNs = 50 * 1000 * 1000;
const long kNamePollNs = 100 * 1000;

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

// This process's rasteriser threads: task id by rasteriser number.
std::map<int, pid_t> rasterisers() {
    std::map<int, pid_t> found;
    DIR* tasks = opendir("/proc/self/task");
    if (tasks == nullptr) return found;
    while (dirent* entry = readdir(tasks)) {
        if (entry->d_name[0] == '.') continue;
        const int number = rasteriserNumber(entry->d_name);
        if (number >= 0) found[number] = (pid_t)atoi(entry->d_name);
    }
    closedir(tasks);
    return found;
}

// As many as llvmpipe starts: one a processor unless LP_NUM_THREADS says.
size_t expectedRasterisers() {
    const char* setting = getenv("LP_NUM_THREADS");
    long count = setting != nullptr ? strtol(setting, nullptr, 10) : sysconf(_SC_NPROCESSORS_ONLN);
    if (count < 0) count = 0;
    return (size_t)(count < kMaxRasterisers ? count : kMaxRasterisers);
}

// Only Mesa's software driver ("swrast") has rasteriser threads to wait for.
bool softwareDriver(EGLDisplay display) {
    using DriverName = const char* (*)(EGLDisplay);
    const DriverName name =
        reinterpret_cast<DriverName>(eglGetProcAddress("eglGetDisplayDriverName"));
    const char* driver = name != nullptr ? name(display) : nullptr;
    if (driver == nullptr) eglGetError();  // ours, not the caller's to find
    return driver != nullptr && strstr(driver, "swrast") != nullptr;
}

long elapsedNs(const timespec& since) {
    timespec now{};
    clock_gettime(CLOCK_MONOTONIC, &now);
    return (now.tv_sec - since.tv_sec) * 1000000000L + (now.tv_nsec - since.tv_nsec);
}

}  // namespace

int RasteriserAffinity_apply(EGLDisplay display) {
    const char* setting = getenv("KIV_HOST_RASTERISER_AFFINITY");
    if ((setting != nullptr && strcmp(setting, "0") == 0) || !softwareDriver(display)) return 0;
    cpu_set_t allowed;
    if (sched_getaffinity(0, sizeof(allowed), &allowed) != 0) return 0;
    std::vector<int> cores;
    for (int cpu = 0; cpu < CPU_SETSIZE; ++cpu) {
        if (CPU_ISSET(cpu, &allowed)) cores.push_back(cpu);
    }
    if (cores.size() < 2) return 0;
    std::map<int, pid_t> threads = rasterisers();
    const size_t expected = expectedRasterisers();
    timespec start{};
    clock_gettime(CLOCK_MONOTONIC, &start);
    while (threads.size() < expected && elapsedNs(start) < kNameWaitNs) {
        const timespec pause{0, kNamePollNs};
        nanosleep(&pause, nullptr);
        threads = rasterisers();
    }
    int placed = 0, refused = 0, error = 0;
    for (const auto& thread : threads) {
        cpu_set_t one;
        CPU_ZERO(&one);
        CPU_SET(cores[(size_t)thread.first % cores.size()], &one);
        if (sched_setaffinity(thread.second, sizeof(one), &one) == 0) {
            ++placed;
        } else {
            ++refused;
            error = errno;
        }
    }
    if (refused > 0) {
        VF_LogMsg(VF_LOG_WARNING, "Host GL: %d rasteriser thread(s) keep every core: %s", refused,
                  strerror(error));
    }
    return placed;
}

}  // namespace android
