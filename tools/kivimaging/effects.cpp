#include "effects.h"

#include <cxxabi.h>
#include <dirent.h>
#include <stdlib.h>
#include <strings.h>

#include <algorithm>
#include <typeinfo>

#include "args.h"
#include "core/KivBuiltInFilterCatalog.h"
#include "core/KivFilterExternal.h"
#include "core/KivFilterName.h"
#include "core/KivImaging.h"
#include "core/KivParameterOption.h"
#include "core/KivDevicePath.h"

namespace kivcli {
namespace {

const int kRanges[][2] = {{200, 213}, {400, 447}, {500, 508}};
constexpr int kDownloadableId = 2000;

bool describe(int id, EffectInfo* info) {
    KivFilter* filter = KivImaging_create(id, nullptr);
    if (filter == nullptr) return false;
    info->id = id;
    info->className = effectClassName(filter);
    info->filterType = filter->getFilterType();
    info->options.clear();
    const char* const* names = KivImaging_listOptionNames(filter);
    for (int i = 0; names != nullptr && names[i] != nullptr; i++) info->options.push_back(names[i]);
    info->parameterKeys.clear();
    const char* const* keys = KivFilter_parameterKeys(filter);
    for (int i = 0; keys != nullptr && keys[i] != nullptr; i++)
        info->parameterKeys.push_back(keys[i]);
    KivImaging_destroy(filter);
    return true;
}

}  // namespace

std::string effectClassName(const KivFilter* filter) {
    if (filter == nullptr) return "";
    const char* mangled = typeid(*filter).name();
    int status = 0;
    char* demangled = abi::__cxa_demangle(mangled, nullptr, nullptr, &status);
    std::string name = (status == 0 && demangled != nullptr) ? demangled : mangled;
    free(demangled);
    size_t colon = name.rfind("::");
    if (colon != std::string::npos) name = name.substr(colon + 2);
    return name;
}

std::vector<EffectInfo> effectList() {
    std::vector<EffectInfo> list;
    for (const auto& range : kRanges) {
        for (int id = range[0]; id <= range[1]; id++) {
            EffectInfo info;
            if (describe(id, &info)) list.push_back(info);
        }
    }
    return list;
}

bool effectResolve(const std::string& arg, EffectChoice* choice, std::string* error) {
    *choice = EffectChoice();
    if (arg.empty()) {
        *error = "empty effect name";
        return false;
    }
    int id = 0;
    if (parseInt(arg, -2147483647, 2147483647, &id)) {
        EffectInfo info;
        if (id == kDownloadableId || !describe(id, &info)) {
            *error = "no effect has id " + arg + " (see 'kivimaging effects')";
            return false;
        }
        choice->id = id;
        choice->label = std::to_string(id) + " " + info.className;
        return true;
    }
    for (const EffectInfo& info : effectList()) {
        if (strcasecmp(info.className.c_str(), arg.c_str()) == 0) {
            choice->id = info.id;
            choice->label = std::to_string(info.id) + " " + info.className;
            return true;
        }
    }
    // Filter-library names: the catalog maps the ones built in to effect ids.
    android::sp<KivBuiltInFilterCatalog> catalog =
        new KivBuiltInFilterCatalog(BUILT_IN_FILTER_MORVANE);
    int builtIn = catalog->getBuiltInFilterId(arg.c_str());
    if (builtIn != -1) {
        choice->library = arg;
        choice->label = arg;
        return true;
    }
    if (arg.find(',') != std::string::npos) {
        KivFilterExternal external(const_cast<char*>(arg.c_str()));
        if (external.hasPlugin()) {
            choice->library = arg;
            choice->label = arg;
            return true;
        }
        *error = "no filter library '" + arg + "' could be loaded (-v tells why)";
        return false;
    }
    *error = "unknown effect '" + arg + "' (see 'kivimaging effects')";
    return false;
}

std::vector<PluginInfo> pluginList() {
    std::vector<PluginInfo> list;
    for (const char* device :
         {KivFilterExternal::kPreloadLibraryDir, KivFilterExternal::kDownloadLibraryDir}) {
        char folder[4096];
        int length = KivPlatform_devicePath(device, folder, sizeof(folder));
        if (length < 0 || length >= int(sizeof(folder))) continue;
        DIR* dir = opendir(folder);
        for (dirent* entry; dir != nullptr && (entry = readdir(dir)) != nullptr;) {
            if (entry->d_name[0] == '.') continue;
            PluginInfo info;
            info.path = std::string(folder) + entry->d_name;
            KivFilterName name;
            if (KivFilterName_fromFileName(entry->d_name, &name)) {
                info.effectName = name.package + "," + name.library;
                KivFilterExternal effect(const_cast<char*>(info.effectName.c_str()));
                // A library whose name leads to the other folder is not reachable.
                info.loads = effect.hasPlugin() && effect.getLibraryPath() == info.path;
                if (info.loads) {
                    info.pluginName = effect.getPluginName();
                    info.capabilities = effect.getCapabilities();
                    info.formats = effect.getSupportedFormats();
                }
            }
            list.push_back(info);
        }
        if (dir != nullptr) closedir(dir);
    }
    std::sort(list.begin(), list.end(), [](const PluginInfo& a, const PluginInfo& b) {
        return a.effectName != b.effectName ? a.effectName < b.effectName : a.path < b.path;
    });
    return list;
}

}  // namespace kivcli
