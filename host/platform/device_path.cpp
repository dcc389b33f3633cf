#include "core/KivDevicePath.h"

#include <stdio.h>
#include <stdlib.h>
#include <string.h>

extern "C" int KivPlatform_devicePath(const char* devicePath, char* out, size_t size) {
    if (devicePath == nullptr) return -1;
    const char* root = getenv("KIV_SYSROOT");
    if (root == nullptr) root = "";
    int length = static_cast<int>(strlen(root));
    while (length > 0 && root[length - 1] == '/') --length;
    return snprintf(out, size, "%.*s%s", length, root, devicePath);
}
