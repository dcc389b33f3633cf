// Open descriptors of the test process: host buffers keep their pixels in
// memory files, so a leak of one shows here.
#ifndef KIV_TESTS_SUPPORT_OPEN_FILES_H
#define KIV_TESTS_SUPPORT_OPEN_FILES_H

#include <dirent.h>

inline int Test_openFiles() {
    DIR* dir = opendir("/proc/self/fd");
    int n = 0;
    while (dir != nullptr && readdir(dir) != nullptr) ++n;
    if (dir != nullptr) closedir(dir);
    return n;
}

#endif
