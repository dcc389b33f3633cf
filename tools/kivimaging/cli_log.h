// Where the library's log lines go while the tool runs: nowhere by default,
// standard error with --verbose. Error lines are counted either way, because
// some processing failures are reported only through the log.
#ifndef TOOLS_KIVIMAGING_CLI_LOG_H
#define TOOLS_KIVIMAGING_CLI_LOG_H

namespace kivcli {

// Installs the tool's handlers for the image core's log and the Android log.
void cliLogSetup(bool verbose);

// Error-level lines logged by the library since the program started.
int cliLogErrorCount();

}  // namespace kivcli

#endif
