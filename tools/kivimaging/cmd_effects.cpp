#include <stdio.h>

#include "args.h"
#include "cli.h"
#include "cli_log.h"
#include "effects.h"

namespace kivcli {
namespace {

const char kHelp[] =
    "Usage: kivimaging effects [-v]\n"
    "\n"
    "Lists every effect the library's factory serves: its id, its class name, the\n"
    "type id the effect reports (it differs from the id on purpose for a few\n"
    "effects) and the names of its options ('-' for none). Use the id or the class\n"
    "name with 'apply -e'; effects with the option 'parameter' take -p \"name=value,...\"\n"
    "with the names shown beside it (whole numbers, -200 to 200 for the colour\n"
    "controls; a name missing from the text takes its neutral value).\n";

const OptionSpec kOptions[] = {
    {'h', "help", false},
    {'v', "verbose", false},
};

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
