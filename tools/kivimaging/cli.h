// The kivimaging command line: one function per command, each taking the
// arguments after the command name's position (argv[0] is the command).
#ifndef TOOLS_KIVIMAGING_CLI_H
#define TOOLS_KIVIMAGING_CLI_H

#include <string>

namespace kivcli {

// Exit status: success, a picture could not be read/processed/written, bad arguments.
enum { kExitOk = 0, kExitFailure = 1, kExitUsage = 2 };

int cliMain(int argc, char** argv);

int cmdEffects(int argc, char** argv);
int cmdApply(int argc, char** argv);
int cmdGallery(int argc, char** argv);
int cmdSample(int argc, char** argv);
int cmdLive(int argc, char** argv);

// "kivimaging <command>: <message>" and a pointer to --help on standard error;
// returns kExitUsage.
int usageError(const char* command, const std::string& message);
// "kivimaging: <message>" on standard error; returns kExitFailure.
int failure(const std::string& message);

}  // namespace kivcli

#endif
