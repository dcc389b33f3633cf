#include "file_io.h"

#include <errno.h>
#include <fcntl.h>
#include <limits.h>
#include <stdio.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

namespace kivcli {
namespace {

std::string failed(const char* verb, const std::string& path, const std::string& reason) {
    return std::string("cannot ") + verb + " '" + path + "': " + reason;
}

// A stream that starts neither like a JPEG (FF D8) nor like a PNG (0x89 'P')
// is not read any further.
bool startsLikeAPicture(const FileBytes& bytes) {
    if (bytes.size() < 2) return true;
    return (bytes[0] == 0xFF && bytes[1] == 0xD8) || (bytes[0] == 0x89 && bytes[1] == 'P');
}

std::string folderOf(const std::string& path) {
    size_t slash = path.find_last_of('/');
    if (slash == std::string::npos) return ".";
    return slash == 0 ? "/" : path.substr(0, slash);
}

bool writeAll(int fd, const unsigned char* bytes, size_t length) {
    while (length > 0) {
        ssize_t n = write(fd, bytes, length);
        if (n < 0 && errno == EINTR) continue;
        if (n <= 0) {
            if (n == 0) errno = EIO;
            return false;
        }
        bytes += n;
        length -= static_cast<size_t>(n);
    }
    return true;
}

}  // namespace

bool fileReadPicture(const std::string& path, FileBytes* bytes, std::string* error) {
    int fd = open(path.c_str(), O_RDONLY | O_CLOEXEC);
    if (fd < 0) {
        *error = failed("read", path, strerror(errno));
        return false;
    }
    struct stat st;
    if (fstat(fd, &st) != 0 || S_ISDIR(st.st_mode)) {
        *error = failed("read", path, S_ISDIR(st.st_mode) ? "it is a directory" : strerror(errno));
        close(fd);
        return false;
    }
    bytes->clear();
    // The decoders take an int length.
    const size_t limit = INT_MAX;
    if (S_ISREG(st.st_mode) && st.st_size > 0 && static_cast<size_t>(st.st_size) <= limit)
        bytes->reserve(static_cast<size_t>(st.st_size));
    unsigned char chunk[1 << 16];
    int readError = 0;
    while (startsLikeAPicture(*bytes)) {
        ssize_t n = read(fd, chunk, sizeof(chunk));
        if (n < 0 && errno == EINTR) continue;
        if (n < 0) readError = errno;
        if (n <= 0) break;
        if (static_cast<size_t>(n) > limit - bytes->size()) {
            close(fd);
            *error = failed("read", path, "it is larger than 2 GB");
            return false;
        }
        bytes->insert(bytes->end(), chunk, chunk + n);
    }
    close(fd);
    if (readError != 0) {
        *error = failed("read", path, strerror(readError));
        return false;
    }
    if (bytes->empty()) {
        *error = failed("read", path, "the file is empty");
        return false;
    }
    return true;
}

bool fileWriteAtomic(const std::string& path, const unsigned char* bytes, size_t length,
                     std::string* error) {
    const std::string folder = folderOf(path);
    std::string base = path.substr(path.find_last_of('/') + 1);
    if (base.size() > 160) base.resize(160);  // room for the suffix within NAME_MAX
    // A hidden name beside the target (same file system, so the rename is
    // atomic) that no other writer, even of the same target, picks.
    static unsigned serial = 0;
    std::string temporary;
    int fd = -1;
    for (int attempt = 0; attempt < 100 && fd < 0; ++attempt) {
        temporary = folder + "/." + base + "." + std::to_string(getpid()) + "-" +
                    std::to_string(serial++) + ".tmp";
        fd = open(temporary.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0644);
        if (fd < 0 && errno != EEXIST) break;
    }
    if (fd < 0) {
        *error = failed("write", path, strerror(errno));
        return false;
    }
    bool ok = writeAll(fd, bytes, length) && fsync(fd) == 0;
    int reason = errno;
    if (close(fd) != 0 && ok) {
        ok = false;
        reason = errno;
    }
    if (ok && rename(temporary.c_str(), path.c_str()) != 0) {
        ok = false;
        reason = errno;
    }
    if (!ok) {
        unlink(temporary.c_str());
        *error = failed("write", path, strerror(reason));
        return false;
    }
    // The rename itself reaches the disk with its folder; a folder that
    // cannot be synced (some file systems) does not undo the write.
    int dir = open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (dir >= 0) {
        fsync(dir);
        close(dir);
    }
    return true;
}

bool fileSame(const std::string& a, const std::string& b) {
    struct stat sa, sb;
    return stat(a.c_str(), &sa) == 0 && stat(b.c_str(), &sb) == 0 && sa.st_dev == sb.st_dev &&
           sa.st_ino == sb.st_ino;
}

}  // namespace kivcli
