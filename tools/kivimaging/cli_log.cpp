#include "cli_log.h"

#include <stdarg.h>
#include <stdio.h>
#include <string.h>

#include <atomic>

#include <android/log.h>

#include "vccore/vc_log.h"

namespace kivcli {
namespace {

std::atomic<int> gErrors{0};
bool gVerbose = false;

// Lines the library logs at error level on purpose during normal work (a
// trace of every buffer lock, the 8K texture toggle): shown as the debug
// traces they are, so that an error label means an error.
const char* const kRoutineErrorLines[] = {
    "EGL: lockGraphicBuffer format : ",
    "EGL: Enable GL_ENABLE_8K_TEXTURES_AND_RENDERING_QCOM",
    "EGL: Disable GL_ENABLE_8K_TEXTURES_AND_RENDERING_QCOM",
};

int shownLevel(int level, const char* line) {
    if (level < VF_LOG_ERROR) return level;
    for (const char* routine : kRoutineErrorLines) {
        if (strncmp(line, routine, strlen(routine)) == 0) return VF_LOG_DEBUG;
    }
    return level;
}

void coreLog(int level, const char* format, ...) __attribute__((format(printf, 2, 3)));

void coreLog(int level, const char* format, ...) {
    if (!gVerbose && level < VF_LOG_ERROR) return;
    char line[2048];
    va_list args;
    va_start(args, format);
    vsnprintf(line, sizeof(line), format, args);
    va_end(args);
    if (level >= VF_LOG_ERROR && cliLogIsErrorReport(line)) gErrors++;
    if (gVerbose) fprintf(stderr, "%s %s\n", VF_LogLabel(shownLevel(level, line)), line);
}

void androidLog(const struct __android_logger_data* data, const char* message) {
    if (data->priority >= ANDROID_LOG_ERROR && cliLogIsErrorReport(message)) gErrors++;
    if (!gVerbose) return;
    fprintf(stderr, "[%s] %s\n", data->tag != nullptr ? data->tag : "", message);
}

}  // namespace

void cliLogSetup(bool verbose) {
    gVerbose = verbose;
    VF_LogMsg = coreLog;
    __android_log_set_logger(androidLog);
    // Below this priority the Android log drops lines before any logger sees them.
    __android_log_set_minimum_priority(verbose ? ANDROID_LOG_VERBOSE : ANDROID_LOG_ERROR);
}

int cliLogErrorCount() {
    return gErrors.load();
}

bool cliLogIsErrorReport(const char* message) {
    return message != nullptr && strncmp(message, "VC_ERROR_", 9) == 0 &&
           strstr(message, " (-") != nullptr;
}

}  // namespace kivcli
