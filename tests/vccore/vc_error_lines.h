// Counting the error lines the image core reports ("NAME (code): source:line").
#ifndef KIV_TESTS_VC_ERROR_LINES_H
#define KIV_TESTS_VC_ERROR_LINES_H

#include <regex>
#include <string>

#include "support/log_capture.h"

inline int countErrors(const LogCapture& log, const char* name, int code,
                       const char* source = "vccore/src/vc_image") {
    const std::regex re(std::string(name) + " \\(" + std::to_string(code) + "\\): " + source +
                        ":[0-9]+");
    int n = 0;
    for (const LoggedLine& line : log.lines())
        if (line.level == 4 && std::regex_match(line.text, re)) ++n;
    return n;
}

#endif
