#include <stdio.h>

#include "args.h"
#include "cli.h"
#include "cli_log.h"
#include "effects.h"
#include "kivimaging/KivFilterPlugin.h"

namespace kivcli {
namespace {

const char kHelp[] =
    "Usage: kivimaging effects [--plugins] [-v]\n"
    "\n"
    "Lists every effect the library's factory serves: its id, its class name, the\n"
    "type id the effect reports (it differs from the id on purpose for a few\n"
    "effects) and the names of its options ('-' for none). Use the id or the class\n"
    "name with 'apply -e'; effects with the option 'parameter' take -p \"name=value,...\"\n"
    "with the names shown beside it (whole numbers, -200 to 200 for the colour\n"
    "controls; a name missing from the text takes its neutral value).\n"
    "\n"
    "  --plugins   list the filter libraries installed in the device's filter folders\n"
    "              (/system/cameradata/preloadfilters/Lib/arm/ and /data/DownFilters/Lib/,\n"
    "              under $KIV_SYSROOT when set) instead: the name to give 'apply -e',\n"
    "              the plug-in's name, whether it draws with GL or processes on the\n"
    "              CPU, and its CPU formats\n";

const OptionSpec kOptions[] = {
    {'h', "help", false},
    {'v', "verbose", false},
    {0, "plugins", false},
};

std::string formatNames(int bits) {
    static const char* const kNames[] = {"RGBA", "BGRA", "NV21", "NV12"};
    std::string out;
    for (int i = 0; i < 4; i++)
        if (bits & (1 << i)) out += (out.empty() ? "" : " ") + std::string(kNames[i]);
    return out.empty() ? "-" : out;
}

int listPlugins() {
    std::vector<PluginInfo> list = pluginList();
    size_t usable = 0;
    printf("%-44s %-16s %-6s %s\n", "NAME (apply -e)", "PLUG-IN", "DRAWS", "CPU FORMATS");
    for (const PluginInfo& p : list) {
        if (!p.loads) {
            printf("%-44s (not usable: %s)\n", p.effectName.empty() ? "-" : p.effectName.c_str(),
                   p.effectName.empty()
                       ? ("not a filter library name: " + p.path).c_str()
                       : ("cannot be loaded from " + p.path + "; -v tells why").c_str());
            continue;
        }
        usable++;
        std::string draws = (p.capabilities & KIV_PLUGIN_CAP_GL) ? "GL" : "";
        if (p.capabilities & KIV_PLUGIN_CAP_CPU) draws += draws.empty() ? "CPU" : "+CPU";
        printf("%-44s %-16s %-6s %s\n", p.effectName.c_str(), p.pluginName.c_str(),
               draws.empty() ? "-" : draws.c_str(),
               (p.capabilities & KIV_PLUGIN_CAP_CPU) ? formatNames(p.formats).c_str() : "-");
    }
    printf("%zu plug-ins", usable);
    if (usable != list.size()) printf(", %zu files not usable", list.size() - usable);
    printf("\n");
    return kExitOk;
}

}  // namespace

int cmdEffects(int argc, char** argv) {
    ParsedArgs args;
    std::string error;
    if (!parseArgs(argc, argv, 1, kOptions, sizeof(kOptions) / sizeof(kOptions[0]), &args,
                   &error)) {
        return usageError("effects", error);
    }
    if (args.has("help")) {
        fputs(kHelp, stdout);
        return kExitOk;
    }
    if (!args.positionals.empty()) {
        return usageError("effects", "unexpected argument '" + args.positionals[0] + "'");
    }
    cliLogSetup(args.has("verbose"));
    if (args.has("plugins")) return listPlugins();

    std::vector<EffectInfo> list = effectList();
    if (list.empty()) return failure("the library serves no effect");
    printf("%5s  %-22s %11s  %s\n", "ID", "CLASS", "TYPE", "OPTIONS");
    for (const EffectInfo& e : list) {
        std::string options;
        for (const std::string& o : e.options) {
            options += (options.empty() ? "" : ", ") + o;
            if (o != "parameter" || e.parameterKeys.empty()) continue;
            std::string keys;
            for (const std::string& k : e.parameterKeys)
                keys += (keys.empty() ? "" : ",") + k + "=N";
            options += " (" + keys + ")";
        }
        printf("%5d  %-22s %11d  %s\n", e.id, e.className.c_str(), e.filterType,
               options.empty() ? "-" : options.c_str());
    }
    printf("%zu effects\n", list.size());
    return kExitOk;
}

}  // namespace kivcli
