// Where the library's log lines go while the tool runs: nowhere by default,
// standard error with --verbose. Error reports are counted either way, because
// some processing failures reach the caller only through the log.
#ifndef TOOLS_KIVIMAGING_CLI_LOG_H
#define TOOLS_KIVIMAGING_CLI_LOG_H

namespace kivcli {

// Installs the tool's handlers for the image core's log and the Android log.
void cliLogSetup(bool verbose);

// Error reports ("VC_ERROR_… (code): source:line", the one line the library
// logs where a failure arises) since the program started. Other error-level
// lines are diagnostics the library prints during normal work.
int cliLogErrorCount();

// Whether a log line is such an error report.
bool cliLogIsErrorReport(const char* message);

}  // namespace kivcli

#endif
