// Reading whole files and replacing them safely, with the system's reason
// on failure.
#ifndef TOOLS_KIVIMAGING_FILE_IO_H
#define TOOLS_KIVIMAGING_FILE_IO_H

#include <stddef.h>

#include <memory>
#include <string>
#include <vector>

#include "vccore/vc_stream.h"

namespace kivcli {

using FileBytes = std::vector<unsigned char>;

// Reads a whole file, or anything that streams like one (a FIFO, a process
// substitution). Stops early on a stream that cannot be a picture: it must
// start like a JPEG or a PNG. False with "cannot read '<path>': <reason>".
bool fileReadPicture(const std::string& path, FileBytes* bytes, std::string* error);

// A picture file its decoder reads as it goes, so that a large file is never
// whole in memory: regular files only (a FIFO cannot be read twice, and the
// whole-picture path may need the bytes again). Its first bytes, enough for
// its format and its EXIF, are read at once.
class PictureFile {
public:
    PictureFile() = default;
    ~PictureFile();
    // False with "cannot read '<path>': <reason>"; true with regular() false
    // (and nothing opened) for anything but a regular file.
    bool open(const std::string& path, std::string* error);
    bool regular() const { return mFd >= 0; }
    // The first bytes (all of a small file).
    const FileBytes& head() const { return mHead; }
    bool headIsWhole() const { return (long long)mHead.size() == mSize; }
    // A reader of the file from its start (VCStreamReader_openSource); each
    // reads on its own.
    VCStreamReader* openReader();

    PictureFile(const PictureFile&) = delete;
    PictureFile& operator=(const PictureFile&) = delete;

private:
    struct Cursor {
        PictureFile* file;
        size_t at;
    };
    static long pull(void* cursor, unsigned char* to, size_t count);

    int mFd = -1;
    long long mSize = 0;
    FileBytes mHead;
    std::vector<std::unique_ptr<Cursor>> mCursors;
};

// Replaces `path` with `length` bytes through a temporary file beside it:
// every write, the flush to disk and the close are checked before it is
// renamed over the target (mode 0644 less the umask). On failure the target
// is as it was, the temporary is gone, and `error` names the path and the
// system's reason.
bool fileWriteAtomic(const std::string& path, const unsigned char* bytes, size_t length,
                     std::string* error);

// The same, written as it comes: open(), any number of write()s, then
// commit(); a file never committed leaves the target as it was and no
// temporary behind. A failed write is reported by commit().
class AtomicFile {
public:
    AtomicFile() = default;
    ~AtomicFile();
    bool open(const std::string& path, std::string* error);
    bool write(const unsigned char* bytes, size_t length);
    bool commit(std::string* error);
    // Whether a write failed, and then why.
    bool writeFailed(std::string* error) const;
    AtomicFile(const AtomicFile&) = delete;
    AtomicFile& operator=(const AtomicFile&) = delete;

private:
    std::string mPath, mFolder, mTemporary;
    int mFd = -1;
    int mReason = 0;  // the first write's failure (errno)
    static constexpr size_t kSyncChunk = 1 << 20;
    size_t mWritten = 0;
    size_t mSyncStarted = 0;  // bytes handed to the disk so far
};

// Whether two paths name the same existing file (hard links and symbolic
// links included).
bool fileSame(const std::string& a, const std::string& b);

}  // namespace kivcli

#endif
