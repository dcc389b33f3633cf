#include "core/KivFilterLibrary.h"

#include <dlfcn.h>
#include <errno.h>
#include <fcntl.h>
#include <limits.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <mutex>
#include <vector>

namespace {

std::string resolve(const std::string& path, std::string* error) {
    char resolved[PATH_MAX];
    if (realpath(path.c_str(), resolved) == nullptr) {
        *error = strerror(errno);
        return std::string();
    }
    return resolved;
}

std::string loaderError() {
    const char* text = dlerror();
    return text != nullptr ? text : "unknown loader error";
}

// Libraries whose objects could not be destroyed, with those objects: still
// referenced, so that they are retained on purpose rather than lost.
struct Kept {
    void* handle;
    int fd;
    void* object;
};
std::mutex gKeptLock;
std::vector<Kept>* gKept = nullptr;

}  // namespace

KivFilterLibrary::~KivFilterLibrary() {
    close();
}

bool KivFilterLibrary::open(const std::string& folder, const std::string& fileName,
                            std::string* error) {
    close();
    std::string reason;
    const std::string realFolder = resolve(folder, &reason);
    if (realFolder.empty()) {
        *error = "the folder " + folder + " is not there: " + reason;
        return false;
    }
    const std::string realFile = resolve(folder + fileName, &reason);
    if (realFile.empty()) {
        *error = reason;
        return false;
    }
    const size_t slash = realFile.rfind('/');
    const std::string parent = slash == 0 ? "/" : realFile.substr(0, slash);
    if (parent != realFolder) {
        *error = "it resolves to " + realFile + ", which is not in " + realFolder;
        return false;
    }
    int dir = ::open(realFolder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (dir < 0) {
        *error = strerror(errno);
        return false;
    }
    // No link is followed from here on: an entry swapped for a link after the
    // check above is refused. Non-blocking, so that a FIFO cannot hang us.
    int fd =
        ::openat(dir, realFile.c_str() + slash + 1, O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK);
    const int openErrno = errno;
    ::close(dir);
    if (fd < 0) {
        *error = strerror(openErrno);
        return false;
    }
    struct stat st;
    if (fstat(fd, &st) != 0 || !S_ISREG(st.st_mode)) {
        ::close(fd);
        *error = "not a regular file";
        return false;
    }
    char fdPath[64];
    snprintf(fdPath, sizeof(fdPath), "/proc/self/fd/%d", fd);
    dlerror();
    void* handle = dlopen(fdPath, RTLD_NOW | RTLD_LOCAL);
    if (handle == nullptr) {
        *error = loaderError();
        // Name the file, not the descriptor the loader saw.
        if (error->compare(0, strlen(fdPath), fdPath) == 0) {
            error->replace(0, strlen(fdPath), realFile);
        }
        ::close(fd);
        return false;
    }
    mHandle = handle;
    mFd = fd;
    return true;
}

void* KivFilterLibrary::symbol(const char* name, std::string* error) const {
    if (mHandle == nullptr) {
        if (error != nullptr) *error = "no library";
        return nullptr;
    }
    dlerror();
    void* address = dlsym(mHandle, name);
    if (address == nullptr && error != nullptr) *error = loaderError();
    return address;
}

bool KivFilterLibrary::close(std::string* error) {
    bool ok = true;
    if (mHandle != nullptr) {
        dlerror();
        if (dlclose(mHandle) != 0) {
            ok = false;
            if (error != nullptr) *error = loaderError();
        }
        mHandle = nullptr;
    }
    if (mFd >= 0) {
        ::close(mFd);
        mFd = -1;
    }
    return ok;
}

void KivFilterLibrary::keepForever(void* object) {
    if (mHandle == nullptr) return;
    std::lock_guard<std::mutex> guard(gKeptLock);
    if (gKept == nullptr) gKept = new std::vector<Kept>();
    gKept->push_back({mHandle, mFd, object});
    mHandle = nullptr;
    mFd = -1;
}
