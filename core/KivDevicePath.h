// Fixed device paths ("/system/cameradata/...", "/data/DownFilters/...").
// A device uses them as they are (KivDevicePathDevice.cpp); on a host they
// are looked up under the directory named by KIV_SYSROOT (host/platform), so
// that tests and tools can lay out a device's files in any folder.
#ifndef KIV_CORE_KIVDEVICEPATH_H
#define KIV_CORE_KIVDEVICEPATH_H

#include <stddef.h>

#ifdef __cplusplus
extern "C" {
#endif

// Writes the path under which `devicePath` is found into out (size bytes,
// always terminated when size > 0). On a host: KIV_SYSROOT (trailing slashes
// dropped, read at each call) followed by devicePath, or devicePath alone
// when KIV_SYSROOT is unset or empty; on a device, devicePath alone. Returns
// the full length, as snprintf does (a result >= size means the path did not
// fit), or -1 for a null devicePath.
int KivPlatform_devicePath(const char* devicePath, char* out, size_t size);

#ifdef __cplusplus
}
#endif

#endif
