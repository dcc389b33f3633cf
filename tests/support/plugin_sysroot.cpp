#include "support/plugin_sysroot.h"

#include <stdlib.h>

#include <filesystem>

namespace fs = std::filesystem;

PluginSysroot::PluginSysroot() {
    const char* old = getenv("KIV_SYSROOT");
    mHadRoot = old != nullptr;
    if (old != nullptr) mOldRoot = old;
    if (mDir.path().empty()) return;
    std::error_code error;
    for (const char* dir :
         {"/system/cameradata/preloadfilters/Lib/arm", "/system/cameradata/preloadfilters/Tex",
          "/data/DownFilters/Lib", "/data/DownFilters/Tex"}) {
        fs::create_directories(root() + dir, error);
        if (error) return;
    }
    mOk = setenv("KIV_SYSROOT", root().c_str(), 1) == 0;
}

PluginSysroot::~PluginSysroot() {
    if (mHadRoot) {
        setenv("KIV_SYSROOT", mOldRoot.c_str(), 1);
    } else {
        unsetenv("KIV_SYSROOT");
    }
}

std::string PluginSysroot::preloadLib() const {
    return root() + "/system/cameradata/preloadfilters/Lib/arm/";
}

std::string PluginSysroot::downloadLib() const {
    return root() + "/data/DownFilters/Lib/";
}

std::string PluginSysroot::install(const std::string& library, const std::string& package,
                                   const std::string& file, bool preload) const {
    const std::string target = (preload ? preloadLib() : downloadLib()) + package + "." + file;
    std::error_code error;
    fs::copy_file(library, target, fs::copy_options::overwrite_existing, error);
    return error ? std::string() : target;
}
