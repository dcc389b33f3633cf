// Hostile effect names and hostile filter folders: nothing outside the two
// filter folders is ever opened or loaded. This program defines open, openat,
// fopen and dlopen itself (forwarding to the C library), so it sees every file
// the library opens while an effect is made.
#include <dlfcn.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <limits.h>
#include <stdarg.h>
#include <stdio.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <mutex>
#include <string>
#include <vector>

#include "core/KivFilterExternal.h"
#include "core/KivFilterName.h"
#include "support/log_capture.h"
#include "support/plugin_sysroot.h"
#include "vccore/vc_log.h"

namespace {

// Paths opened by the watched thread while watching, made absolute.
std::mutex gLock;
std::vector<std::string> gOpened;
pthread_t gWatched;
bool gWatching = false;

std::string fdPath(int fd) {
    char link[64], target[PATH_MAX];
    snprintf(link, sizeof(link), "/proc/self/fd/%d", fd);
    ssize_t n = readlink(link, target, sizeof(target) - 1);
    return n > 0 ? std::string(target, size_t(n)) : std::string("?fd");
}

void note(int dirfd, const char* path) {
    std::lock_guard<std::mutex> guard(gLock);
    if (!gWatching || !pthread_equal(pthread_self(), gWatched) || path == nullptr) return;
    std::string p = path;
    if (p.rfind("/proc/self/fd/", 0) == 0)
        p = fdPath(atoi(p.c_str() + 14));
    else if (p[0] != '/')
        p = (dirfd == AT_FDCWD ? std::filesystem::current_path().string() : fdPath(dirfd)) + "/" +
            p;
    gOpened.push_back(p);
}

template <typename F>
F libc(const char* name) {
    return reinterpret_cast<F>(dlsym(RTLD_NEXT, name));
}

}  // namespace

// Each records the path, then calls the C library's own function. The mode
// argument exists only with O_CREAT or O_TMPFILE.
#define KIV_MODE_ARG(flags)                                               \
    va_list a;                                                            \
    va_start(a, flags);                                                   \
    int mode = (flags & (O_CREAT | O_TMPFILE)) != 0 ? va_arg(a, int) : 0; \
    va_end(a)
#define KIV_WATCHED_OPEN(name)                                                 \
    int name(const char* path, int flags, ...) {                               \
        KIV_MODE_ARG(flags);                                                   \
        note(AT_FDCWD, path);                                                  \
        return libc<int (*)(const char*, int, ...)>(#name)(path, flags, mode); \
    }
#define KIV_WATCHED_OPENAT(name)                                                           \
    int name(int dirfd, const char* path, int flags, ...) {                                \
        KIV_MODE_ARG(flags);                                                               \
        note(dirfd, path);                                                                 \
        return libc<int (*)(int, const char*, int, ...)>(#name)(dirfd, path, flags, mode); \
    }

extern "C" {
KIV_WATCHED_OPEN(open)
KIV_WATCHED_OPEN(open64)
KIV_WATCHED_OPENAT(openat)
KIV_WATCHED_OPENAT(openat64)
FILE* fopen(const char* path, const char* mode) {
    note(AT_FDCWD, path);
    return libc<FILE* (*)(const char*, const char*)>("fopen")(path, mode);
}
void* dlopen(const char* file, int mode) {
    note(AT_FDCWD, file);
    return libc<void* (*)(const char*, int)>("dlopen")(file, mode);
}
}

namespace {

namespace fs = std::filesystem;

std::string real(const std::string& path) {
    char out[PATH_MAX];
    return realpath(path.c_str(), out) != nullptr ? out : path;
}

class HostileNames : public ::testing::Test {
protected:
    void SetUp() override {
        ASSERT_TRUE(mRoot.ok());
        // A genuine plug-in outside the folders: the target every escape aims at.
        ASSERT_FALSE(mOutside.path().empty());
        mEvil = mOutside.file("libevil.so");
        fs::copy_file(KIV_EXAMPLE_SOLARIZE, mEvil);
        mFolders = {real(mRoot.downloadLib()), real(mRoot.preloadLib())};
    }
    // Makes the effect while watching; returns what was opened.
    std::vector<std::string> load(const std::string& name, bool* loaded) {
        {
            std::lock_guard<std::mutex> guard(gLock);
            gOpened.clear();
            gWatched = pthread_self();
            gWatching = true;
        }
        KivFilterExternal effect(const_cast<char*>(name.c_str()));
        std::lock_guard<std::mutex> guard(gLock);
        gWatching = false;
        *loaded = effect.hasPlugin();
        return gOpened;
    }
    // Judged by where the path leads, links followed.
    bool insideFolders(const std::string& opened) const {
        const std::string path = real(opened);
        for (const std::string& f : mFolders)
            if (path == f || path.rfind(f + "/", 0) == 0) return true;
        return false;
    }
    PluginSysroot mRoot;
    kivtest::TempDir mOutside;
    std::string mEvil;
    std::vector<std::string> mFolders;
};

TEST_F(HostileNames, AreRefusedBeforeAnyFileIsOpened) {
    const std::string longPackage = "com." + std::string(300, 'a');
    struct Case {
        std::string name;
        KivFilterNameStatus status;
    } cases[] = {
        {"com.kiv.android.filter,../../../../tmp/libevil.so", KIV_FILTER_NAME_LIBRARY_CHARS},
        {"../../../../tmp,libevil.so", KIV_FILTER_NAME_PACKAGE_CHARS},
        {"com.evil,/tmp/libevil.so", KIV_FILTER_NAME_LIBRARY_CHARS},
        {"/tmp/evil,libevil.so", KIV_FILTER_NAME_PACKAGE_CHARS},
        {"com.evil,libevil.so/", KIV_FILTER_NAME_LIBRARY_CHARS},
        {"com.evil,..libevil.so", KIV_FILTER_NAME_LIBRARY_FORM},
        {"com.evil,lib..so", KIV_FILTER_NAME_LIBRARY_FORM},
        {"com.evil,.so", KIV_FILTER_NAME_LIBRARY_FORM},
        {"com.evil,-libevil.so", KIV_FILTER_NAME_LIBRARY_FORM},
        {"com..evil,libevil.so", KIV_FILTER_NAME_PACKAGE_FORM},
        {".com.evil,libevil.so", KIV_FILTER_NAME_PACKAGE_FORM},
        {"com.evil.,libevil.so", KIV_FILTER_NAME_PACKAGE_FORM},
        {"com.1evil,libevil.so", KIV_FILTER_NAME_PACKAGE_FORM},
        {",libevil.so", KIV_FILTER_NAME_PACKAGE_FORM},
        {"com.evil,%2e%2e%2flibevil.so", KIV_FILTER_NAME_LIBRARY_CHARS},
        {"com.evil,..%2Flibevil.so", KIV_FILTER_NAME_LIBRARY_CHARS},
        {"com.evil,lib\\evil.so", KIV_FILTER_NAME_LIBRARY_CHARS},
        {"com.evil,lib\xc0\xaf"
         "evil.so",
         KIV_FILTER_NAME_LIBRARY_CHARS},  // overlong '/'
        {"com.evil,lib\xef\xbc\x8f"
         "evil.so",
         KIV_FILTER_NAME_LIBRARY_CHARS},  // fullwidth '/'
        {"com.evil,lib\xc0\x80"
         "evil.so",
         KIV_FILTER_NAME_LIBRARY_CHARS},  // Java's NUL
        {"com.evil\n[E] forged line,libevil.so", KIV_FILTER_NAME_PACKAGE_CHARS},
        {"com.evil, libevil.so", KIV_FILTER_NAME_LIBRARY_CHARS},
        {"~/evil,libevil.so", KIV_FILTER_NAME_PACKAGE_CHARS},
        {"com.evil,libevil.so,../../etc", KIV_FILTER_NAME_EXTRA_FIELD},
        {"com.evil,libevil", KIV_FILTER_NAME_LIBRARY_SUFFIX},
        {"com.evil,libevil.so.", KIV_FILTER_NAME_LIBRARY_SUFFIX},
        {"com.evil", KIV_FILTER_NAME_NO_LIBRARY},
        {"", KIV_FILTER_NAME_NO_LIBRARY},
        {"com.evil,", KIV_FILTER_NAME_LIBRARY_FORM},
        {longPackage + ",libevil.so", KIV_FILTER_NAME_TOO_LONG},
    };
    for (const Case& c : cases) {
        EXPECT_EQ(c.status, KivFilterName_parse(c.name.c_str(), nullptr)) << c.name;
        LogCapture log;
        bool loaded = true;
        EXPECT_EQ(std::vector<std::string>{}, load(c.name, &loaded)) << c.name;
        EXPECT_FALSE(loaded) << c.name;
        // One refusal line naming the reason, the name in printable form.
        const std::string line = "Downloadable Filter: refused the effect name \"" +
                                 KivFilterName_printable(c.name.c_str()) +
                                 "\": " + KivFilterName_reason(c.status);
        EXPECT_TRUE(log.contains(VF_LOG_ERROR, line)) << line;
        for (const std::string& l : log.texts()) {
            for (char ch : l) ASSERT_TRUE(ch >= 0x20 && ch < 0x7f) << "unprintable in: " << l;
        }
    }
    EXPECT_EQ("com.evil\\x0a[E],lib\\xc0\\x80\\x22\\x5c",
              KivFilterName_printable("com.evil\n[E],lib\xc0\x80\"\\"));
    EXPECT_EQ("abc...", KivFilterName_printable("abcdef", 3));
}

TEST_F(HostileNames, FoldersAndLinksNeverLeadOutside) {
    const std::string down = mRoot.downloadLib();
    // Links out of the folder, relative and absolute, into the other filter
    // folder, to a device, in a loop, dangling; and entries that are not files.
    fs::create_symlink(mEvil, down + "com.evil.libabs.so");
    fs::create_symlink(
        "../../../../" + fs::path(mOutside.path()).filename().string() + "/libevil.so",
        down + "com.evil.librel.so");
    fs::copy_file(KIV_EXAMPLE_SOLARIZE, mRoot.preloadLib() + "com.kiv.android.filter.libp.so");
    fs::create_symlink(mRoot.preloadLib() + "com.kiv.android.filter.libp.so",
                       down + "com.evil.libcross.so");
    fs::create_symlink("/dev/zero", down + "com.evil.libdev.so");
    fs::create_symlink(down + "com.evil.libloop2.so", down + "com.evil.libloop1.so");
    fs::create_symlink(down + "com.evil.libloop1.so", down + "com.evil.libloop2.so");
    fs::create_symlink(down + "nothing", down + "com.evil.libdangling.so");
    ASSERT_EQ(0, mkfifo((down + "com.evil.libfifo.so").c_str(), 0600));
    fs::create_directory(down + "com.evil.libdir.so");
    // Accepted: a link to another file of the same folder.
    fs::copy_file(KIV_EXAMPLE_SOLARIZE, down + "com.good.libreal.so");
    fs::create_symlink("com.good.libreal.so", down + "com.good.liblink.so");
    struct Case {
        std::string name;
        bool loads;
        std::string reason;  // end of the "is not opened" line
    } cases[] = {
        {"com.evil,libabs.so", false, "which is not in " + real(down)},
        {"com.evil,librel.so", false, "which is not in " + real(down)},
        {"com.evil,libcross.so", false, "which is not in " + real(down)},
        {"com.evil,libdev.so", false, "it resolves to /dev/zero, which is not in " + real(down)},
        {"com.evil,libloop1.so", false, "Too many levels of symbolic links"},
        {"com.evil,libdangling.so", false, "No such file or directory"},
        {"com.evil,libfifo.so", false, "not a regular file"},
        {"com.evil,libdir.so", false, "not a regular file"},
        // A NUL ends the name: what follows it is never seen.
        {std::string("com.good,libreal.so\0/../../../etc/passwd", 40), true, ""},
        {"com.good,liblink.so", true, ""},
    };
    for (const Case& c : cases) {
        LogCapture log;
        bool loaded = false;
        std::vector<std::string> opened = load(c.name.c_str(), &loaded);
        EXPECT_EQ(c.loads, loaded) << c.name;
        for (const std::string& p : opened)
            EXPECT_TRUE(insideFolders(p)) << c.name << " opened " << p;
        if (c.loads) {
            // The watch sees the library being opened and mapped.
            EXPECT_EQ(3u, opened.size()) << c.name;
        } else {
            size_t found = 0;
            for (const std::string& l : log.texts())
                found += l.find(" is not opened, ") != std::string::npos &&
                         l.size() >= c.reason.size() &&
                         l.compare(l.size() - c.reason.size(), c.reason.size(), c.reason) == 0;
            EXPECT_EQ(1u, found) << c.name << "\n" << ::testing::PrintToString(log.texts());
        }
    }
    // A filter folder that is itself a link is judged by where it leads.
    fs::remove_all(mRoot.root() + "/data/DownFilters/Lib");
    fs::create_directory(mOutside.file("lib"));
    fs::copy_file(KIV_EXAMPLE_SOLARIZE, mOutside.file("lib/com.good.libreal.so"));
    fs::create_symlink(mOutside.file("lib"), mRoot.root() + "/data/DownFilters/Lib");
    mFolders[0] = real(mOutside.file("lib"));
    bool loaded = false;
    for (const std::string& p : load("com.good,libreal.so", &loaded))
        EXPECT_TRUE(insideFolders(p)) << p;
    EXPECT_TRUE(loaded);
}

}  // namespace
