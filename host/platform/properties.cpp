#include <cutils/properties.h>

#include <stdlib.h>
#include <string.h>

namespace {

const char kPrefix[] = "KIV_PROP_";

// KIV_PROP_ + key with dots as underscores; false when the key does not fit.
bool variableName(const char* key, char* name, size_t capacity) {
    size_t prefix = sizeof(kPrefix) - 1;
    size_t length = strlen(key);
    if (prefix + length + 1 > capacity) return false;
    memcpy(name, kPrefix, prefix);
    for (size_t i = 0; i < length; ++i) name[prefix + i] = key[i] == '.' ? '_' : key[i];
    name[prefix + length] = '\0';
    return true;
}

int copyOut(char* value, const char* text) {
    size_t length = strlen(text);
    if (length > PROPERTY_VALUE_MAX - 1) length = PROPERTY_VALUE_MAX - 1;
    memcpy(value, text, length);
    value[length] = '\0';
    return (int)length;
}

}  // namespace

extern "C" int property_get(const char* key, char* value, const char* default_value) {
    if (value == nullptr) return 0;
    const char* found = nullptr;
    char name[sizeof(kPrefix) + PROPERTY_KEY_MAX + 64];
    if (key != nullptr && variableName(key, name, sizeof(name))) {
        found = getenv(name);
        if (found != nullptr && found[0] == '\0') found = nullptr;
    }
    if (found == nullptr) found = default_value != nullptr ? default_value : "";
    return copyOut(value, found);
}
