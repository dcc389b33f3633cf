// A device tree for downloadable filters in a temporary folder: the preload
// and download folders (Lib and Tex) exist, KIV_SYSROOT points at it for the
// object's lifetime, and filter libraries are installed by copying.
#ifndef KIV_TESTS_SUPPORT_PLUGIN_SYSROOT_H
#define KIV_TESTS_SUPPORT_PLUGIN_SYSROOT_H

#include <string>

#include "support/temp_dir.h"

class PluginSysroot {
public:
    PluginSysroot();
    // Restores KIV_SYSROOT as it was.
    ~PluginSysroot();
    bool ok() const { return mOk; }

    const std::string& root() const { return mDir.path(); }
    // Lib folders as the library forms them (under the root, ending in '/').
    std::string preloadLib() const;
    std::string downloadLib() const;

    // Copies `library` into the preload or download Lib folder as
    // "<package>.<file>"; returns the installed path ("" on failure).
    std::string install(const std::string& library, const std::string& package,
                        const std::string& file, bool preload = false) const;

    PluginSysroot(const PluginSysroot&) = delete;
    PluginSysroot& operator=(const PluginSysroot&) = delete;

private:
    kivtest::TempDir mDir;
    bool mOk = false;
    bool mHadRoot = false;
    std::string mOldRoot;
};

#endif
