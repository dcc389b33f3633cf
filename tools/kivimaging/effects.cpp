#include "effects.h"

#include <cxxabi.h>
#include <stdlib.h>
#include <strings.h>

#include <typeinfo>

#include "args.h"
#include "core/KivBuiltInFilterCatalog.h"
#include "core/KivImaging.h"
#include "core/KivParameterOption.h"

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
        KivFilter* external = KivImaging_create(kDownloadableId, const_cast<char*>(arg.c_str()));
        if (external != nullptr) {
            KivImaging_destroy(external);
            choice->library = arg;
            choice->label = arg;
            return true;
        }
        *error = "no filter library '" + arg + "' could be loaded";
        return false;
    }
    *error = "unknown effect '" + arg + "' (see 'kivimaging effects')";
    return false;
}

}  // namespace kivcli
