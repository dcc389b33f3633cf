// Command-line options: -x VALUE, -xVALUE, --name VALUE, --name=VALUE, flags,
// and "--" to end the options.
#ifndef TOOLS_KIVIMAGING_ARGS_H
#define TOOLS_KIVIMAGING_ARGS_H

#include <stddef.h>

#include <map>
#include <string>
#include <vector>

namespace kivcli {

struct OptionSpec {
    char shortName;  // 0: long form only
    const char* longName;
    bool takesValue;
};

struct ParsedArgs {
    std::map<std::string, std::string> values;  // by long name; flags map to ""
    std::vector<std::string> positionals;

    bool has(const char* name) const { return values.count(name) != 0; }
    std::string get(const char* name, const std::string& fallback = "") const;
};

// Parses argv[first…argc-1]. On a malformed line returns false with a message
// naming the offending argument. A repeated option keeps its last value.
bool parseArgs(int argc, char** argv, int first, const OptionSpec* options, size_t count,
               ParsedArgs* out, std::string* error);

// A whole decimal integer within [min, max]; false otherwise.
bool parseInt(const std::string& text, int min, int max, int* value);

// "WxH" with both sides within [min, max].
bool parseSize(const std::string& text, int min, int max, int* width, int* height);

}  // namespace kivcli

#endif
