#include "file_io.h"

#include <errno.h>
#include <fcntl.h>
#include <limits.h>
#include <stdio.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>

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

namespace {

// Enough for the markers before a JPEG's frame, EXIF included (a segment
// holds at most 64 KB), in nearly every file.
constexpr size_t kHeadBytes = 256 << 10;

// Up to `count` bytes at `offset`: how many (0 at the end), -1 on an error.
ssize_t readAt(int fd, unsigned char* to, size_t count, size_t offset) {
    for (;;) {
        ssize_t n = pread(fd, to, count, (off_t)offset);
        if (n >= 0 || errno != EINTR) return n;
    }
}

}  // namespace

PictureFile::~PictureFile() {
    if (mFd >= 0) close(mFd);
}

bool PictureFile::open(const std::string& path, std::string* error) {
    struct stat st;
    if (stat(path.c_str(), &st) == 0 && !S_ISREG(st.st_mode)) return true;
    int fd = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
    if (fd < 0 || fstat(fd, &st) != 0) {
        *error = failed("read", path, strerror(errno));
        if (fd >= 0) close(fd);
        return false;
    }
    if (!S_ISREG(st.st_mode)) {
        close(fd);
        return true;
    }
    if (st.st_size == 0) {
        close(fd);
        *error = failed("read", path, "the file is empty");
        return false;
    }
    mHead.resize(std::min((size_t)st.st_size, kHeadBytes));
    size_t got = 0;
    ssize_t n = 0;
    while (got < mHead.size() && (n = readAt(fd, mHead.data() + got, mHead.size() - got, got)) > 0)
        got += (size_t)n;
    if (got < mHead.size()) {
        *error = failed("read", path, n < 0 ? strerror(errno) : "it ended early");
        close(fd);
        return false;
    }
    mFd = fd;
    mSize = st.st_size;
    return true;
}

VCStreamReader* PictureFile::openReader() {
    if (mFd < 0) return nullptr;
    mCursors.push_back(std::unique_ptr<Cursor>(new Cursor{this, 0}));
    return VCStreamReader_openSource(pull, mCursors.back().get());
}

long PictureFile::pull(void* user, unsigned char* to, size_t count) {
    Cursor* cursor = static_cast<Cursor*>(user);
    const FileBytes& head = cursor->file->mHead;
    if (cursor->at < head.size()) {
        const size_t n = std::min(count, head.size() - cursor->at);
        memcpy(to, head.data() + cursor->at, n);
        cursor->at += n;
        return (long)n;
    }
    const ssize_t n = readAt(cursor->file->mFd, to, count, cursor->at);
    if (n > 0) cursor->at += (size_t)n;
    return n < 0 ? -1 : (long)n;
}

bool AtomicFile::open(const std::string& path, std::string* error) {
    mPath = path;
    mFolder = folderOf(path);
    std::string base = path.substr(path.find_last_of('/') + 1);
    if (base.size() > 160) base.resize(160);  // room for the suffix within NAME_MAX
    // A hidden name beside the target (same file system, so the rename is
    // atomic) that no other writer, even of the same target, picks.
    static unsigned serial = 0;
    for (int attempt = 0; attempt < 100 && mFd < 0; ++attempt) {
        mTemporary = mFolder + "/." + base + "." + std::to_string(getpid()) + "-" +
                     std::to_string(serial++) + ".tmp";
        mFd = ::open(mTemporary.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0644);
        if (mFd < 0 && errno != EEXIST) break;
    }
    if (mFd < 0) {
        *error = failed("write", path, strerror(errno));
        return false;
    }
    return true;
}

bool AtomicFile::write(const unsigned char* bytes, size_t length) {
    if (mFd < 0 || mReason != 0) return false;
    if (!writeAll(mFd, bytes, length)) mReason = errno;
    mWritten += length;
    // The disk starts on what is written while the rest is still being
    // made, so that the sync at the end waits only for the last of it.
    if (mReason == 0 && mWritten - mSyncStarted >= kSyncChunk) {
        sync_file_range(mFd, (off_t)mSyncStarted, (off_t)(mWritten - mSyncStarted),
                        SYNC_FILE_RANGE_WRITE);
        mSyncStarted = mWritten;
    }
    return mReason == 0;
}

bool AtomicFile::commit(std::string* error) {
    if (mFd < 0) return false;
    if (mReason == 0 && fsync(mFd) != 0) mReason = errno;
    if (close(mFd) != 0 && mReason == 0) mReason = errno;
    mFd = -1;
    if (mReason == 0 && rename(mTemporary.c_str(), mPath.c_str()) != 0) mReason = errno;
    if (mReason != 0) {
        unlink(mTemporary.c_str());
        *error = failed("write", mPath, strerror(mReason));
        return false;
    }
    mTemporary.clear();
    // The rename itself reaches the disk with its folder; a folder that
    // cannot be synced (some file systems) does not undo the write.
    int dir = ::open(mFolder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (dir >= 0) {
        fsync(dir);
        close(dir);
    }
    return true;
}

bool AtomicFile::writeFailed(std::string* error) const {
    if (mReason == 0) return false;
    *error = failed("write", mPath, strerror(mReason));
    return true;
}

AtomicFile::~AtomicFile() {
    if (mFd >= 0) close(mFd);
    if (!mTemporary.empty()) unlink(mTemporary.c_str());
}

bool fileWriteAtomic(const std::string& path, const unsigned char* bytes, size_t length,
                     std::string* error) {
    AtomicFile file;
    if (!file.open(path, error)) return false;
    file.write(bytes, length);
    return file.commit(error);
}

bool fileSame(const std::string& a, const std::string& b) {
    struct stat sa, sb;
    return stat(a.c_str(), &sa) == 0 && stat(b.c_str(), &sb) == 0 && sa.st_dev == sb.st_dev &&
           sa.st_ino == sb.st_ino;
}

}  // namespace kivcli
