// Fuzzes the downloadable-filter name checks: whatever the bytes, an accepted
// name must make a file name that stays inside its folder and is split back
// into the same name, and a refused one must print as one harmless log line.
#include <stddef.h>
#include <stdint.h>
#include <string.h>

#include <string>

#include "core/KivFilterName.h"

namespace {

void check(bool ok) {
    if (!ok) __builtin_trap();
}

bool isAlnum(char c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9');
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    const std::string text(reinterpret_cast<const char*>(data), size);  // stops at a NUL
    const char* name = text.c_str();
    KivFilterName parsed;
    const KivFilterNameStatus status = KivFilterName_parse(name, &parsed);
    check(status == KIV_FILTER_NAME_OK || strlen(KivFilterName_reason(status)) > 0);

    const std::string printable = KivFilterName_printable(name);
    for (char c : printable) check(c >= 0x20 && c < 0x7f && c != '"');

    if (status != KIV_FILTER_NAME_OK) return 0;
    // Exactly the given text, split at its one comma.
    check(parsed.package + "," + parsed.library == name);
    const std::string file = parsed.fileName();
    check(file.size() <= kKivFilterNameMaxFileName);
    // Nothing that a path could resolve outside the folder.
    check(file.find('/') == std::string::npos && file.find("..") == std::string::npos);
    check(file[0] != '.' && file[0] != '-');
    for (char c : file) check(isAlnum(c) || c == '.' || c == '_' || c == '-');
    check(file.compare(file.size() - 3, 3, ".so") == 0);
    // The listing finds the same file again under a name that loads it.
    KivFilterName back;
    check(KivFilterName_fromFileName(file.c_str(), &back));
    check(back.fileName() == file);
    check(KivFilterName_parse((back.package + "," + back.library).c_str(), nullptr) ==
          KIV_FILTER_NAME_OK);
    return 0;
}
