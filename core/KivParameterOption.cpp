#include "core/KivParameterOption.h"

#include <errno.h>
#include <stdlib.h>
#include <string.h>

#include <string>
#include <vector>

#include "core/egl/EglCheck.h"
#include "vccore/vc_log.h"

namespace {

int keyIndex(const char* const* keys, const std::string& name) {
    for (int i = 0; keys != nullptr && keys[i] != nullptr; ++i) {
        if (name == keys[i]) return i;
    }
    return -1;
}

// Whether `value` is written as exactly the integer `read` (what strtol takes whole).
bool writtenAs(const std::string& value, int read) {
    if (value.empty()) return false;
    errno = 0;
    char* end = nullptr;
    long written = strtol(value.c_str(), &end, 10);
    return errno == 0 && end != nullptr && *end == '\0' && written == read;
}

}  // namespace

const char* const* KivFilter_parameterKeys(const KivFilter* filter) {
    const auto* keys = dynamic_cast<const KivParameterKeys*>(filter);
    return keys != nullptr ? keys->parameterKeys() : nullptr;
}

int KivParameterString_check(const char* effect, const char* text, const char* const* keys) {
    if (text == nullptr) return 0;
    if (effect == nullptr) effect = "effect";
    int logged = 0;
    std::vector<bool> seen;
    for (int i = 0; keys != nullptr && keys[i] != nullptr; ++i) seen.push_back(false);

    const char* start = text;
    while (true) {
        const char* comma = strchr(start, ',');
        std::string pair = comma ? std::string(start, comma) : std::string(start);
        // An empty part (a trailing or doubled comma) changes nothing.
        if (!pair.empty()) {
            size_t equals = pair.find('=');
            int key = equals == std::string::npos ? -1 : keyIndex(keys, pair.substr(0, equals));
            if (equals == std::string::npos) {
                EglLog(VF_LOG_WARNING, "%s: '%s' is not a name=value pair; ignored", effect,
                       pair.c_str());
                ++logged;
            } else if (key < 0) {
                EglLog(VF_LOG_WARNING, "%s: unknown parameter '%s' ignored", effect,
                       pair.substr(0, equals).c_str());
                ++logged;
            } else if (seen[key]) {
                EglLog(VF_LOG_WARNING, "%s: '%s' is given more than once; the first one counts",
                       effect, keys[key]);
                ++logged;
            } else {
                seen[key] = true;
                // Asked with two defaults, the parser tells whether it read a value.
                int read = VCOption_ParseStringI(text, keys[key], 0);
                if (read != VCOption_ParseStringI(text, keys[key], 1)) {
                    EglLog(VF_LOG_WARNING, "%s: '%s' could not be read; the neutral value is used",
                           effect, pair.c_str());
                    ++logged;
                } else if (!writtenAs(pair.substr(equals + 1), read)) {
                    EglLog(VF_LOG_WARNING, "%s: '%s' read as %s=%d", effect, pair.c_str(),
                           keys[key], read);
                    ++logged;
                }
            }
        }
        if (comma == nullptr) break;
        start = comma + 1;
    }
    return logged;
}
