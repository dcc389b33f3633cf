#include "args.h"

#include <errno.h>
#include <stdlib.h>

namespace kivcli {

std::string ParsedArgs::get(const char* name, const std::string& fallback) const {
    auto it = values.find(name);
    return it == values.end() ? fallback : it->second;
}

namespace {

const OptionSpec* findShort(const OptionSpec* options, size_t count, char c) {
    for (size_t i = 0; i < count; i++) {
        if (options[i].shortName != 0 && options[i].shortName == c) return &options[i];
    }
    return nullptr;
}

const OptionSpec* findLong(const OptionSpec* options, size_t count, const std::string& name) {
    for (size_t i = 0; i < count; i++) {
        if (name == options[i].longName) return &options[i];
    }
    return nullptr;
}

}  // namespace

bool parseArgs(int argc, char** argv, int first, const OptionSpec* options, size_t count,
               ParsedArgs* out, std::string* error) {
    bool optionsEnded = false;
    for (int i = first; i < argc; i++) {
        std::string arg = argv[i];
        if (optionsEnded || arg.size() < 2 || arg[0] != '-') {
            out->positionals.push_back(arg);
            continue;
        }
        if (arg == "--") {
            optionsEnded = true;
            continue;
        }
        const OptionSpec* option = nullptr;
        std::string value;
        bool inlineValue = false;
        if (arg[1] == '-') {
            std::string name = arg.substr(2);
            size_t eq = name.find('=');
            if (eq != std::string::npos) {
                value = name.substr(eq + 1);
                name = name.substr(0, eq);
                inlineValue = true;
            }
            option = findLong(options, count, name);
            if (option == nullptr) {
                *error = "unknown option '--" + name + "'";
                return false;
            }
            if (inlineValue && !option->takesValue) {
                *error = "option '--" + name + "' takes no value";
                return false;
            }
        } else {
            option = findShort(options, count, arg[1]);
            if (option == nullptr) {
                *error = "unknown option '" + arg.substr(0, 2) + "'";
                return false;
            }
            if (arg.size() > 2) {
                if (!option->takesValue) {
                    *error = "option '-" + std::string(1, arg[1]) + "' takes no value";
                    return false;
                }
                value = arg.substr(2);
                inlineValue = true;
            }
        }
        if (option->takesValue && !inlineValue) {
            if (i + 1 >= argc) {
                *error = "option '--" + std::string(option->longName) + "' needs a value";
                return false;
            }
            value = argv[++i];
        }
        out->values[option->longName] = value;
    }
    return true;
}

bool parseInt(const std::string& text, int min, int max, int* value) {
    if (text.empty()) return false;
    errno = 0;
    char* end = nullptr;
    long v = strtol(text.c_str(), &end, 10);
    if (errno != 0 || end == text.c_str() || *end != '\0' || v < min || v > max) return false;
    *value = static_cast<int>(v);
    return true;
}

bool parseSize(const std::string& text, int min, int max, int* width, int* height) {
    size_t x = text.find_first_of("xX");
    if (x == std::string::npos) return false;
    return parseInt(text.substr(0, x), min, max, width) &&
           parseInt(text.substr(x + 1), min, max, height);
}

}  // namespace kivcli
