// The device side of the fixed paths: a device has its files where the paths
// say. The host's lookup under KIV_SYSROOT is in host/platform.
#ifdef __ANDROID__

#include "core/KivDevicePath.h"

#include <stdio.h>

extern "C" int KivPlatform_devicePath(const char* devicePath, char* out, size_t size) {
    if (devicePath == nullptr) return -1;
    return snprintf(out, size, "%s", devicePath);
}

#endif
