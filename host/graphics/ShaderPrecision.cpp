#include "host/graphics/ShaderPrecision.h"

#include <string.h>

#include <atomic>

#include <GLES2/gl2.h>

namespace android {

namespace {

bool isWordChar(char c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '_';
}

// The length of the qualifier that starts at `p` as a whole word, else 0.
size_t qualifierAt(const char* start, const char* p) {
    if (p != start && isWordChar(p[-1])) return 0;
    for (const char* word : {"mediump", "lowp"}) {
        size_t n = strlen(word);
        if (strncmp(p, word, n) == 0 && !isWordChar(p[n])) return n;
    }
    return 0;
}

// 23 fraction bits: what IEEE single precision (and so a full highp) has.
constexpr int kSingleFractionBits = 23;

enum Answer { UNKNOWN, PROMOTE, KEEP };
std::atomic<int> gAnswer[2] = {{UNKNOWN}, {UNKNOWN}};

}  // namespace

const char* ShaderPrecision_highp(const char* source, std::string* storage) {
    if (source == nullptr) return nullptr;
    bool found = false;
    for (const char* p = source; *p != '\0' && !found; ++p) found = qualifierAt(source, p) != 0;
    if (!found) return source;
    storage->clear();
    for (const char* p = source; *p != '\0';) {
        size_t n = qualifierAt(source, p);
        if (n != 0) {
            storage->append("highp");
            p += n;
        } else {
            storage->push_back(*p++);
        }
    }
    return storage->c_str();
}

bool ShaderPrecision_promotes(unsigned int type) {
    std::atomic<int>& answer = gAnswer[type == GL_VERTEX_SHADER ? 0 : 1];
    int known = answer.load();
    if (known != UNKNOWN) return known == PROMOTE;
    GLint range[2] = {0, 0};
    GLint medium = 0;
    GLint high = 0;
    glGetShaderPrecisionFormat(type, GL_MEDIUM_FLOAT, range, &medium);
    glGetShaderPrecisionFormat(type, GL_HIGH_FLOAT, range, &high);
    // Without a context nothing is written: no answer yet, ask again later.
    if (medium == 0 && high == 0) return false;
    const bool promote = medium < kSingleFractionBits && high >= kSingleFractionBits;
    answer = promote ? PROMOTE : KEEP;
    return promote;
}

}  // namespace android
