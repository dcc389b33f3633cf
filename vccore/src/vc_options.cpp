#include "vccore/vc_options.h"

#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include <algorithm>
#include <mutex>
#include <utility>
#include <vector>

#include "vccore/vc_log.h"

namespace {

using Entry = std::pair<int32_t, VCOption_t*>;

// Sorted by key, compared as signed values.
struct Registry {
    std::mutex lock;  // registration may come from effects built on different threads
    std::vector<Entry> entries;
};

Registry& registry() {
    static Registry* r = new Registry;  // outlives every static effect record
    return *r;
}

uint32_t gKeyCounter = VCOPTION_KEY_BASE;

uint32_t nextKey() {
    return __atomic_add_fetch(&gKeyCounter, 1u, __ATOMIC_SEQ_CST);
}

std::vector<Entry>::iterator findKey(std::vector<Entry>& entries, int32_t key) {
    auto it = std::lower_bound(entries.begin(), entries.end(), key,
                               [](const Entry& e, int32_t k) { return e.first < k; });
    return (it != entries.end() && it->first == key) ? it : entries.end();
}

void dump(const std::vector<Entry>& entries) {
    for (size_t i = 0; i < entries.size(); ++i) {
        int index = static_cast<int>(i);
        const VCOption_t* o = entries[i].second;
        if (o == nullptr) {
            VF_LogMsg(VF_LOG_DEBUG, "OptionsRegister[%02d]: NULL", index);
            continue;
        }
        switch (o->type) {
            case VCOPTION_TYPE_INTEGER:
                VF_LogMsg(VF_LOG_DEBUG, "OptionsRegister[%02d]: '%s' 0x%08x INTEGER %d - %d", index,
                          o->name, o->key, o->min.value.i, o->max.value.i);
                break;
            case VCOPTION_TYPE_FLOAT:
                VF_LogMsg(VF_LOG_DEBUG, "OptionsRegister[%02d]: '%s' 0x%08x FLOAT %f - %f", index,
                          o->name, o->key, static_cast<double>(o->min.value.f),
                          static_cast<double>(o->max.value.f));
                break;
            case VCOPTION_TYPE_STRING:
                VF_LogMsg(VF_LOG_DEBUG, "OptionsRegister[%02d]: '%s' 0x%08x STRING", index, o->name,
                          o->key);
                break;
            case VCOPTION_TYPE_ENUM:
                if (o->enumValues == nullptr) {
                    VF_LogMsg(VF_LOG_ERROR, "OptionsRegister[%02d]: '%s' 0x%08x ENUM <NO VALUES>",
                              index, o->name, o->key);
                    break;
                }
                for (const VCOptionEnum_t* e = o->enumValues; e->value != -1; ++e) {
                    VF_LogMsg(VF_LOG_DEBUG, "OptionsRegister[%02d]: '%s' 0x%08x ENUM [%d] %s",
                              index, o->name, o->key, e->value, e->name);
                }
                break;
            default:
                VF_LogMsg(VF_LOG_ERROR, "OptionsRegister[%02d]: '%s' 0x%08x INVALID TYPE (%d)",
                          index, o->name, o->key, o->type);
                break;
        }
    }
}

// Finds the text after "name=" in a private copy of the string, cut at the
// next ','. Returns the copy (to free) and sets *value, or null when absent.
char* findValue(const char* paramString, const char* name, const char** value) {
    if (paramString == nullptr || name == nullptr) return nullptr;
    char* copy = strdup(paramString);
    size_t nameLength = strlen(name);
    char* pattern = static_cast<char*>(malloc(nameLength + 2));
    if (copy == nullptr || pattern == nullptr) {
        free(copy);
        free(pattern);
        return nullptr;
    }
    memcpy(pattern, name, nameLength);
    pattern[nameLength] = '=';
    pattern[nameLength + 1] = '\0';
    char* hit = strstr(copy, pattern);
    free(pattern);
    // Only the first occurrence counts, even when a later one is well delimited.
    if (hit == nullptr || (hit != copy && hit[-1] != ',')) {
        free(copy);
        return nullptr;
    }
    char* comma = strchr(hit, ',');
    if (comma != nullptr) *comma = '\0';
    *value = hit + nameLength + 1;
    return copy;
}

}  // namespace

extern "C" int VCOption_RegisterNew(VCOption_t* option) {
    if (option == nullptr) return 0;
    Registry& r = registry();
    // Everything is decided under the lock and logged after it: a replacement
    // log function may well look options up.
    bool duplicate = false;
    bool newKey = false;
    bool clash = false;
    std::vector<Entry> snapshot;
    {
        std::lock_guard<std::mutex> guard(r.lock);
        if (option->key == 0) {
            for (const Entry& e : r.entries) {
                const VCOption_t* o = e.second;
                if (o != nullptr && o->type == option->type && o->name != nullptr &&
                    option->name != nullptr && strcmp(o->name, option->name) == 0) {
                    option->key = o->key;
                    duplicate = true;
                    break;
                }
            }
            if (!duplicate) {
                option->key = nextKey();
                newKey = true;
            }
        }
        if (!duplicate) {
            int32_t key = static_cast<int32_t>(option->key);
            clash = findKey(r.entries, key) != r.entries.end();
            if (!clash) {
                auto at = std::lower_bound(r.entries.begin(), r.entries.end(), key,
                                           [](const Entry& e, int32_t k) { return e.first < k; });
                r.entries.insert(at, Entry(key, option));
                snapshot = r.entries;
            }
        }
    }
    if (duplicate) {
        VF_LogMsg(VF_LOG_DEBUG, "DEBUG: Duplicate option found: '%s' with type %d. Key = %d",
                  option->name, option->type, static_cast<int>(option->key));
        return 1;
    }
    if (newKey)
        VF_LogMsg(VF_LOG_DEBUG, "DEBUG: Registering option '%s' as key 0x%08x", option->name,
                  option->key);
    if (clash) {
        VF_LogMsg(VF_LOG_ERROR,
                  "ERROR: Trying to register new option with an already existing key! [key = "
                  "0x%08x]",
                  option->key);
        return 0;
    }
    dump(snapshot);
    return 1;
}

extern "C" VCOption_t* VCOption_FindByName(const char* name) {
    if (name == nullptr) return nullptr;
    Registry& r = registry();
    std::lock_guard<std::mutex> guard(r.lock);
    for (const Entry& e : r.entries) {
        if (e.second != nullptr && e.second->name != nullptr && strcmp(e.second->name, name) == 0)
            return e.second;
    }
    return nullptr;
}

extern "C" uint32_t VCOption_FindIdByName(const char* name) {
    const VCOption_t* o = VCOption_FindByName(name);
    return o != nullptr ? o->key : 0;
}

extern "C" VCOption_t* VCOption_FindById(uint32_t key) {
    Registry& r = registry();
    std::lock_guard<std::mutex> guard(r.lock);
    for (const Entry& e : r.entries) {
        if (static_cast<uint32_t>(e.first) == key) return e.second;
    }
    return nullptr;
}

extern "C" const char* VCOption_FindNameById(uint32_t key) {
    const VCOption_t* o = VCOption_FindById(key);
    return o != nullptr ? o->name : nullptr;
}

extern "C" int VCOption_CheckValueI(const VCOption_t* option, int value) {
    if (option == nullptr || option->type != VCOPTION_TYPE_INTEGER) return 0;
    int lo = option->min.value.i;
    int hi = option->max.value.i;
    if (lo == 0 && hi == 0) return 1;
    return lo <= value && value <= hi;
}

extern "C" int VCOption_CheckValueF(const VCOption_t* option, float value) {
    if (option == nullptr || option->type != VCOPTION_TYPE_FLOAT) return 0;
    float lo = option->min.value.f;
    float hi = option->max.value.f;
    if (lo == 0.0f && hi == 0.0f) return 1;
    return lo <= value && value <= hi;
}

extern "C" int VCOption_CheckValueS(const VCOption_t* option, const char* value) {
    if (option == nullptr) return 0;
    if (option->type == VCOPTION_TYPE_STRING) return 1;
    if (option->type != VCOPTION_TYPE_ENUM || value == nullptr || option->enumValues == nullptr)
        return 0;
    for (const VCOptionEnum_t* e = option->enumValues; e->value != -1; ++e) {
        if (e->name != nullptr && strcmp(e->name, value) == 0) return 1;
    }
    return 0;
}

extern "C" int VCOption_ParseStringI(const char* paramString, const char* name, int defaultValue) {
    const char* text = nullptr;
    char* copy = findValue(paramString, name, &text);
    int result = defaultValue;
    if (copy != nullptr) {
        if (sscanf(text, "%d", &result) != 1) result = defaultValue;
        free(copy);
    }
    return result;
}

extern "C" float VCOption_ParseStringF(const char* paramString, const char* name,
                                       float defaultValue) {
    const char* text = nullptr;
    char* copy = findValue(paramString, name, &text);
    float result = defaultValue;
    if (copy != nullptr) {
        if (sscanf(text, "%f", &result) != 1) result = defaultValue;
        free(copy);
    }
    return result;
}

namespace {

// strncpy of at most 255 characters with the 256th forced to the terminator.
void copyName(char* dst, const char* src) {
    size_t n = strnlen(src, 255);
    memmove(dst, src, n);
    dst[n] = '\0';
}

}  // namespace

void swap(int* keyA, int* keyB, char* nameA, char* nameB) {
    int key = *keyA;
    *keyA = *keyB;
    *keyB = key;
    char name[256];
    copyName(name, nameA);
    copyName(nameA, nameB);
    copyName(nameB, name);
}

void sort(int* keys, char (*names)[256], int lo, int hi) {
    if (keys == nullptr || names == nullptr || lo >= hi) return;
    int pivot = keys[(lo + hi) / 2];
    int i = lo;
    int j = hi;
    while (i <= j) {
        while (keys[i] < pivot) ++i;
        while (keys[j] > pivot) --j;
        if (i <= j) {
            if (i != j) swap(&keys[i], &keys[j], names[i], names[j]);
            ++i;
            --j;
        }
    }
    if (lo < j) sort(keys, names, lo, j);
    if (i < hi) sort(keys, names, i, hi);
}
