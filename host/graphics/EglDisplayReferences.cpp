// Display references, as Android's EGL keeps them: every successful
// eglInitialize() counts, and eglTerminate() ends the display only with the
// last one. Mesa terminates at once, which would destroy the host graphics
// context (and every other pipeline's context) whenever one pipeline
// releases its environment. The two definitions below take the place of
// libEGL's for the whole program and forward to it: that is the one reason
// this file exists, and why it changes EGL for every caller.
#include "host/graphics/EglDisplayReferences.h"

#include <dlfcn.h>
#include <link.h>
#include <string.h>

#include <map>
#include <mutex>

#include "host/graphics/HostGl.h"

namespace {

std::mutex& referencesLock() {
    static std::mutex* lock = new std::mutex();
    return *lock;
}

std::map<EGLDisplay, int>& references() {
    static std::map<EGLDisplay, int>* map = new std::map<EGLDisplay, int>();
    return *map;
}

// Mesa loads its DRI driver at the first eglInitialize and unloads it at the
// last eglTerminate. Unloading throws away the driver's once-only state (each
// new display pays to rebuild it) and leaves its static allocations pointing
// from code that is gone, which leak checkers report as ours. Keep it resident.
int pinDriver(struct dl_phdr_info* info, size_t, void*) {
    if (info->dlpi_name != nullptr && strstr(info->dlpi_name, "_dri.so") != nullptr) {
        dlopen(info->dlpi_name, RTLD_NOW | RTLD_NOLOAD | RTLD_NODELETE);
    }
    return 0;
}

template <typename T>
T nextSymbol(const char* name) {
    return reinterpret_cast<T>(dlsym(RTLD_NEXT, name));
}

}  // namespace

int android::EglDisplayReferences_count(EGLDisplay display) {
    std::lock_guard<std::mutex> guard(referencesLock());
    auto found = references().find(display);
    return found != references().end() ? found->second : 0;
}

extern "C" EGLBoolean eglInitialize(EGLDisplay display, EGLint* major, EGLint* minor) {
    static const auto next =
        nextSymbol<EGLBoolean (*)(EGLDisplay, EGLint*, EGLint*)>("eglInitialize");
    std::lock_guard<std::mutex> guard(referencesLock());
    EGLBoolean result = next(display, major, minor);
    if (result == EGL_TRUE && references()[display]++ == 0) dl_iterate_phdr(pinDriver, nullptr);
    return result;
}

extern "C" EGLBoolean eglTerminate(EGLDisplay display) {
    static const auto next = nextSymbol<EGLBoolean (*)(EGLDisplay)>("eglTerminate");
    int left = 0;
    {
        std::lock_guard<std::mutex> guard(referencesLock());
        auto found = references().find(display);
        if (found == references().end() || found->second <= 1) {
            if (found != references().end()) references().erase(found);
            return next(display);
        }
        left = --found->second;
    }
    // Outside the lock: letting the host context go terminates again.
    if (left == 1) android::HostGl::get().onOneDisplayReferenceLeft(display);
    return EGL_TRUE;
}
