#include "core/KivFilterName.h"

#include <string.h>

namespace {

bool isLetter(char c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z');
}

bool isDigit(char c) {
    return c >= '0' && c <= '9';
}

KivFilterNameStatus checkPackage(const std::string& package) {
    for (char c : package) {
        if (!isLetter(c) && !isDigit(c) && c != '_' && c != '.') {
            return KIV_FILTER_NAME_PACKAGE_CHARS;
        }
    }
    // Segments: non-empty, each starting with a letter (so no "..", and no
    // leading or trailing dot).
    bool segmentStart = true;
    for (char c : package) {
        if (segmentStart && !isLetter(c)) return KIV_FILTER_NAME_PACKAGE_FORM;
        segmentStart = c == '.';
    }
    if (segmentStart) return KIV_FILTER_NAME_PACKAGE_FORM;  // empty, or ends in '.'
    return KIV_FILTER_NAME_OK;
}

KivFilterNameStatus checkLibrary(const std::string& library) {
    for (char c : library) {
        if (!isLetter(c) && !isDigit(c) && c != '_' && c != '.' && c != '-') {
            return KIV_FILTER_NAME_LIBRARY_CHARS;
        }
    }
    if (library.empty() || library[0] == '.' || library[0] == '-' ||
        library.find("..") != std::string::npos) {
        return KIV_FILTER_NAME_LIBRARY_FORM;
    }
    const size_t n = library.size();
    if (n < 3 || library.compare(n - 3, 3, ".so") != 0) return KIV_FILTER_NAME_LIBRARY_SUFFIX;
    return KIV_FILTER_NAME_OK;
}

}  // namespace

KivFilterNameStatus KivFilterName_parse(const char* text, KivFilterName* out) {
    if (text == nullptr) return KIV_FILTER_NAME_NULL;
    // "<package>,<library>" is exactly as long as the file name it becomes.
    const size_t length = strnlen(text, kKivFilterNameMaxFileName + 1);
    if (length > kKivFilterNameMaxFileName) return KIV_FILTER_NAME_TOO_LONG;
    const char* comma = static_cast<const char*>(memchr(text, ',', length));
    if (comma == nullptr) return KIV_FILTER_NAME_NO_LIBRARY;
    const char* end = text + length;
    if (memchr(comma + 1, ',', static_cast<size_t>(end - comma - 1)) != nullptr) {
        return KIV_FILTER_NAME_EXTRA_FIELD;
    }
    std::string package(text, comma);
    std::string library(comma + 1, end);
    KivFilterNameStatus status = checkPackage(package);
    if (status == KIV_FILTER_NAME_OK) status = checkLibrary(library);
    if (status != KIV_FILTER_NAME_OK) return status;
    if (out != nullptr) {
        out->package = package;
        out->library = library;
    }
    return KIV_FILTER_NAME_OK;
}

const char* KivFilterName_reason(KivFilterNameStatus status) {
    switch (status) {
        case KIV_FILTER_NAME_OK:
            return "";
        case KIV_FILTER_NAME_NULL:
            return "no name";
        case KIV_FILTER_NAME_NO_LIBRARY:
            return "no comma between the package and the library file name";
        case KIV_FILTER_NAME_EXTRA_FIELD:
            return "more than one comma";
        case KIV_FILTER_NAME_TOO_LONG:
            return "the library's file name would be longer than 255 bytes";
        case KIV_FILTER_NAME_PACKAGE_CHARS:
            return "the package name holds a character other than letters, digits, '_' and '.'";
        case KIV_FILTER_NAME_PACKAGE_FORM:
            return "the package name is not dot-separated parts that each start with a letter";
        case KIV_FILTER_NAME_LIBRARY_CHARS:
            return "the library file name holds a character other than letters, digits, '.', "
                   "'_' and '-'";
        case KIV_FILTER_NAME_LIBRARY_FORM:
            return "the library file name is empty, starts with '.' or '-', or holds \"..\"";
        case KIV_FILTER_NAME_LIBRARY_SUFFIX:
            return "the library file name does not end in \".so\"";
    }
    return "unknown";
}

bool KivFilterName_fromFileName(const char* fileName, KivFilterName* out) {
    if (fileName == nullptr) return false;
    const std::string name(fileName, strnlen(fileName, kKivFilterNameMaxFileName + 1));
    bool found = false;
    bool foundLib = false;
    KivFilterName best;
    for (size_t dot = name.find('.'); dot != std::string::npos; dot = name.find('.', dot + 1)) {
        const std::string joined = name.substr(0, dot) + "," + name.substr(dot + 1);
        KivFilterName candidate;
        if (KivFilterName_parse(joined.c_str(), &candidate) != KIV_FILTER_NAME_OK) continue;
        const bool isLib = candidate.library.compare(0, 3, "lib") == 0;
        // Later dots give shorter libraries; a "lib…" library beats any other.
        if (isLib || !foundLib) {
            best = candidate;
            found = true;
            foundLib = foundLib || isLib;
        }
    }
    if (found && out != nullptr) *out = best;
    return found;
}

std::string KivFilterName_printable(const char* text, size_t max) {
    if (text == nullptr) return "(null)";
    static const char kHex[] = "0123456789abcdef";
    std::string out;
    size_t i = 0;
    for (; text[i] != '\0' && i < max; ++i) {
        const unsigned char c = static_cast<unsigned char>(text[i]);
        if (c >= 0x20 && c < 0x7f && c != '\\' && c != '"') {
            out += static_cast<char>(c);
        } else {
            out += "\\x";
            out += kHex[c >> 4];
            out += kHex[c & 15];
        }
    }
    if (text[i] != '\0') out += "...";
    return out;
}
