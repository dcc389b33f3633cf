// Effect names of downloadable filters: "<package>,<library file>". The names
// become a file name ("<package>.<library file>") inside a filter folder, so
// anything that could leave the folder or confuse a file system is refused
// here, before a file is opened. Plain C++, no other part of the library.
#ifndef KIV_CORE_KIVFILTERNAME_H
#define KIV_CORE_KIVFILTERNAME_H

#include <stddef.h>

#include <string>

enum KivFilterNameStatus {
    KIV_FILTER_NAME_OK = 0,
    KIV_FILTER_NAME_NULL,
    KIV_FILTER_NAME_NO_LIBRARY,      // no comma
    KIV_FILTER_NAME_EXTRA_FIELD,     // a second comma
    KIV_FILTER_NAME_TOO_LONG,        // "<package>.<library>" over kMaxFileName
    KIV_FILTER_NAME_PACKAGE_CHARS,   // outside letters, digits, '_' and '.'
    KIV_FILTER_NAME_PACKAGE_FORM,    // empty, or a segment not starting with a letter
    KIV_FILTER_NAME_LIBRARY_CHARS,   // outside letters, digits, '.', '_' and '-'
    KIV_FILTER_NAME_LIBRARY_FORM,    // empty, leading '.' or '-', or ".."
    KIV_FILTER_NAME_LIBRARY_SUFFIX,  // not ending in ".so"
};

struct KivFilterName {
    std::string package;
    std::string library;
    // "<package>.<library>": the library's file name in its folder.
    std::string fileName() const { return package + "." + library; }
};

// The longest "<package>.<library>" accepted: one file name (NAME_MAX).
const size_t kKivFilterNameMaxFileName = 255;

// Splits and checks an effect name; `out` is filled only on success.
KivFilterNameStatus KivFilterName_parse(const char* text, KivFilterName* out);

// Why a name was refused, for log lines ("" for KIV_FILTER_NAME_OK).
const char* KivFilterName_reason(KivFilterNameStatus status);

// The inverse of fileName(): splits a file found in a filter folder back into
// package and library. The library is the last part starting with "lib" that
// makes both halves valid, else the shortest valid one. False when no split
// gives a name KivFilterName_parse accepts.
bool KivFilterName_fromFileName(const char* fileName, KivFilterName* out);

// `text` made safe for one log line: printable ASCII as it is, backslash,
// quote and every other byte as \xNN; cut after `max` input bytes with "...".
std::string KivFilterName_printable(const char* text, size_t max = 160);

#endif
