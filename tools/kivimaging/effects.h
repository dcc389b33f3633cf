// What the effect factory serves, as the tool shows it, and how the tool
// turns an -e argument into an effect.
#ifndef TOOLS_KIVIMAGING_EFFECTS_H
#define TOOLS_KIVIMAGING_EFFECTS_H

#include <string>
#include <vector>

class KivFilter;

namespace kivcli {

struct EffectInfo {
    int id;
    std::string className;
    int filterType;  // what the effect reports; may differ from id on purpose
    std::vector<std::string> options;
    std::vector<std::string> parameterKeys;  // what its "parameter" text reads, when it says
};

// Asks the factory for every id of the built-in ranges (200-213, 400-447,
// 500-508) and describes each one it serves, in id order. The downloadable
// filter (2000) needs a library name and is not listed.
std::vector<EffectInfo> effectList();

// The dynamic class name of an effect object ("Sepia"), namespaces dropped.
std::string effectClassName(const KivFilter* filter);

// The effect an -e argument names: an id the factory serves, a class name
// (any case) of a served effect, or a filter-library name ("package,lib.so")
// known to the built-in catalog or loadable as a downloadable filter.
struct EffectChoice {
    int id = -1;          // set for built-in effects
    std::string library;  // set for a filter library served by name
    std::string label;    // "<id> <class name>" or the library name
};

bool effectResolve(const std::string& arg, EffectChoice* choice, std::string* error);

// A file in one of the filter folders ("/system/cameradata/preloadfilters/
// Lib/arm/", "/data/DownFilters/Lib/", under KIV_SYSROOT on a host).
struct PluginInfo {
    std::string path;        // the file
    std::string effectName;  // "package,library", what -e takes; "" for other files
    bool loads = false;      // that name leads to this file and its plug-in loads
    std::string pluginName;
    int capabilities = 0;
    int formats = 0;
};

// Every file of both folders, each tried as a filter library, by effect name.
std::vector<PluginInfo> pluginList();

}  // namespace kivcli

#endif
