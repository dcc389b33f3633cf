// One temporary folder and one file reader and writer for every suite.
#ifndef KIV_TESTS_SUPPORT_TEMP_DIR_H
#define KIV_TESTS_SUPPORT_TEMP_DIR_H

#include <stdlib.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

namespace kivtest {

using Bytes = std::vector<unsigned char>;

// A fresh directory under /tmp, removed with its content at the end of the scope.
class TempDir {
public:
    TempDir() {
        char pattern[] = "/tmp/kiv_test_XXXXXX";
        const char* made = mkdtemp(pattern);
        mPath = made != nullptr ? made : "";
    }
    ~TempDir() {
        std::error_code ignored;  // a destructor must not throw
        if (!mPath.empty()) std::filesystem::remove_all(mPath, ignored);
    }
    std::string file(const std::string& name) const { return mPath + "/" + name; }
    const std::string& path() const { return mPath; }

    TempDir(const TempDir&) = delete;
    TempDir& operator=(const TempDir&) = delete;

private:
    std::string mPath;
};

inline Bytes readFile(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    return Bytes(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
}

inline std::string readText(const std::string& path) {
    Bytes b = readFile(path);
    return std::string(b.begin(), b.end());
}

inline bool writeFile(const std::string& path, const Bytes& bytes) {
    std::ofstream out(path, std::ios::binary | std::ios::trunc);
    out.write(reinterpret_cast<const char*>(bytes.data()),
              static_cast<std::streamsize>(bytes.size()));
    return static_cast<bool>(out.flush());
}

inline bool fileExists(const std::string& path) {
    return access(path.c_str(), F_OK) == 0;
}

}  // namespace kivtest

#endif
