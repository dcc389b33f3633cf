#include "cli.h"

#include <stdio.h>
#include <string.h>

#include "args.h"
#include "cli_log.h"

namespace kivcli {
namespace {

const char kUsage[] =
    "Usage: kivimaging <command> [options]\n"
    "\n"
    "Applies the library's camera effects to picture files on the GPU (OpenGL ES\n"
    "through EGL; works headless on Mesa).\n"
    "\n"
    "Commands:\n"
    "  effects   list every effect the library serves: id, class name, options\n"
    "  apply     apply one effect to JPEG or PNG files\n"
    "  gallery   render one picture through every effect into a labelled contact sheet\n"
    "  sample    write the built-in test picture\n"
    "  live      run the live pipeline: a virtual camera through an effect, with\n"
    "            preview, recording, pictures and snapshots\n"
    "  help      show this text, or 'help <command>' for a command's options\n"
    "\n"
    "Every command takes --help and -v/--verbose (the library's log on standard error).\n"
    "Exit status: 0 success, 1 a picture could not be read, processed or written,\n"
    "2 bad arguments.\n";

typedef int (*Command)(int, char**);

struct CommandEntry {
    const char* name;
    Command run;
};

const CommandEntry kCommands[] = {
    {"effects", cmdEffects},
    {"apply", cmdApply},
    {"gallery", cmdGallery},
    {"sample", cmdSample},
    {"live", cmdLive},
};

const CommandEntry* findCommand(const char* name) {
    for (const CommandEntry& c : kCommands) {
        if (strcmp(c.name, name) == 0) return &c;
    }
    return nullptr;
}

}  // namespace

int usageError(const char* command, const std::string& message) {
    fprintf(stderr, "kivimaging %s: %s\nTry 'kivimaging %s --help'.\n", command, message.c_str(),
            command);
    return kExitUsage;
}

int failure(const std::string& message) {
    fprintf(stderr, "kivimaging: %s\n", message.c_str());
    return kExitFailure;
}

int cliMain(int argc, char** argv) {
    cliLogSetup(false);
    if (argc < 2) {
        fputs(kUsage, stderr);
        return kExitUsage;
    }
    const char* name = argv[1];
    if (strcmp(name, "--help") == 0 || strcmp(name, "-h") == 0) {
        fputs(kUsage, stdout);
        return kExitOk;
    }
    if (strcmp(name, "help") == 0) {
        if (argc < 3) {
            fputs(kUsage, stdout);
            return kExitOk;
        }
        const CommandEntry* c = findCommand(argv[2]);
        if (c == nullptr) {
            fprintf(stderr, "kivimaging: unknown command '%s'\n\n%s", argv[2], kUsage);
            return kExitUsage;
        }
        char help[] = "--help";
        char* args[] = {argv[2], help, nullptr};
        return c->run(2, args);
    }
    const CommandEntry* c = findCommand(name);
    if (c == nullptr) {
        fprintf(stderr, "kivimaging: unknown command '%s'\n\n%s", name, kUsage);
        return kExitUsage;
    }
    return c->run(argc - 1, argv + 1);
}

}  // namespace kivcli
