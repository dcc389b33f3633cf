// Fixed device paths ("/system/cameradata/...", "/data/DownFilters/...").
// On a host they are looked up under the directory named by KIV_SYSROOT, so
// that tests and tools can lay out a device's files in any folder.
#ifndef KIVPLATFORM_DEVICE_PATH_H
#define KIVPLATFORM_DEVICE_PATH_H

#include <stddef.h>

#ifdef __cplusplus
extern "C" {
#endif

// Writes the path under which `devicePath` is found into out (size bytes,
// always terminated when size > 0): KIV_SYSROOT (trailing slashes dropped)
// followed by devicePath, or devicePath alone when KIV_SYSROOT is unset or
// empty. The variable is read at each call. Returns the full length, as
// snprintf does (a result >= size means the path did not fit), or -1 for a
// null devicePath.
int KivPlatform_devicePath(const char* devicePath, char* out, size_t size);

#ifdef __cplusplus
}
#endif

#endif
