// Image files: saving by extension, loading with a raw fall-back, and the two
// small file helpers.
#include <errno.h>
#include <fcntl.h>
#include <limits.h>
#include <stdlib.h>
#include <string.h>
#include <strings.h>
#include <sys/stat.h>
#include <unistd.h>

#include "vc_image_codec.h"
#include "vc_image_layout.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_file.h"
#include "vccore/vc_log.h"

namespace {

bool containsNoCase(const char* text, const char* needle) {
    size_t n = strlen(needle);
    for (const char* p = text; *p != '\0'; ++p)
        if (strncasecmp(p, needle, n) == 0) return true;
    return false;
}

const char* errorText(int error, char* buffer, size_t size) {
    // GNU strerror_r: thread-safe, returns the text to print.
    return strerror_r(error, buffer, size);
}

// Pixels are handed to the PNG writer as RGBA; any other format goes through
// a temporary RGBA copy that lives until the writer is done with it.
int saveToPng(const VCImage* image, const char* path) {
    uint32_t required = VCImage_requiredSize(image->width, image->height, image->format);
    if (image->data != nullptr && required != 0 && VCImage_size(image) < required)
        return VC_REPORT(VC_ERROR_INVALID_SIZE);
    const VCImage* rgba = image;
    VCImage* copy = nullptr;
    if (image->format != VC_FORMAT_RGBA) {
        copy = VCImage_createNew(image->width, image->height, VC_FORMAT_RGBA);
        if (copy == nullptr || VCImage_allocate(copy) < 0 || VCImage_convert(image, copy) != 0) {
            VCImage_destroy(copy);
            return VC_REPORT(VC_ERROR_UNKNOWN);
        }
        rgba = copy;
    }
    bool ok = VCPng_writeFile(path, rgba->data, rgba->width, rgba->height);
    VCImage_destroy(copy);
    if (!ok) {
        VF_LogMsg(VF_LOG_ERROR, "Failed to save RGBA image with Skia!");
        return VC_REPORT(VC_ERROR_UNKNOWN);
    }
    return 0;
}

}  // namespace

extern "C" long fsize(FILE* file) {
    if (file == nullptr) return -1;
    long position = ftell(file);
    if (position < 0) return -1;
    if (fseek(file, 0, SEEK_END) != 0) return -1;
    long end = ftell(file);
    if (fseek(file, position, SEEK_SET) != 0) return -1;
    return end < 0 ? -1 : end;
}

extern "C" void save_to_file(const char* path, const unsigned char* bytes, size_t length) {
    char text[256];
    VF_LogMsg(VF_LOG_DEBUG, "opening file");
    // Opened without O_TRUNC on purpose: a longer existing file keeps its tail.
    int fd = path != nullptr ? open(path, O_RDWR | O_CREAT | O_CLOEXEC, 0777) : -1;
    if (fd < 0) {
        VF_LogMsg(VF_LOG_ERROR, "failed to create file: %s",
                  errorText(path != nullptr ? errno : EFAULT, text, sizeof(text)));
        return;
    }
    if (bytes == nullptr) length = 0;
    int passes = 0;
    size_t written = 0;
    while (written < length) {
        ++passes;
        ssize_t n = write(fd, bytes + written, length - written);
        if (n < 0 && errno == EINTR) continue;
        if (n <= 0) {
            VF_LogMsg(VF_LOG_ERROR, "failed to write to file: %s",
                      errorText(n < 0 ? errno : EIO, text, sizeof(text)));
            break;
        }
        written += static_cast<size_t>(n);
    }
    VF_LogMsg(VF_LOG_DEBUG, "done writing to file in %d passes\n", passes);
    close(fd);
}

extern "C" int VCImage_saveToFile(const VCImage* image, const char* path, int quality) {
    if (image == nullptr || path == nullptr) return VC_REPORT(VC_ERROR_NULL_PARAM);
    if (quality < 1 || quality > 100) quality = 85;
    if (containsNoCase(path, ".jpeg") || containsNoCase(path, ".jpg")) {
        // A failed encoding is only logged (by the encoder); the call still succeeds.
        VCImage* jpeg = VCImage_encodeToJpeg(image, quality);
        if (jpeg != nullptr) {
            save_to_file(path, jpeg->data, jpeg->size);
            VCImage_destroy(jpeg);
        }
        return 0;
    }
    if (containsNoCase(path, ".png")) return saveToPng(image, path);
    // Raw pixels, as many bytes as the size field says (none when it is 0).
    save_to_file(path, image->data, image->size);
    return 0;
}

extern "C" int VCImage_loadFromFile(VCImage* image, const char* path) {
    VCPicture_setLastFailure(VC_DECODE_READ_FAILED);
    if (image == nullptr || path == nullptr) return VC_REPORT(VC_ERROR_NULL_PARAM);
    FILE* file = fopen(path, "rb");
    if (file == nullptr) return VC_REPORT(VC_ERROR_IO_FAILED);
    struct stat info;
    if (fstat(fileno(file), &info) != 0 || S_ISDIR(info.st_mode)) {
        fclose(file);
        return VC_REPORT(VC_ERROR_IO_FAILED);
    }
    long length = fsize(file);
    if (length <= 0) {
        fclose(file);
        return VC_REPORT(VC_ERROR_IO_FAILED);
    }
    // The decoders take an int length.
    if (length > INT_MAX) {
        fclose(file);
        VCPicture_setLastFailure(VC_DECODE_TOO_LARGE);
        return VC_REPORT(VC_ERROR_INVALID_SIZE);
    }
    unsigned char* buffer = static_cast<unsigned char*>(malloc(static_cast<size_t>(length)));
    if (buffer == nullptr) {
        fclose(file);
        VCPicture_setLastFailure(VC_DECODE_NO_MEMORY);
        return VC_REPORT(VC_ERROR_ALLOC_FAILED);
    }
    size_t total = 0;
    while (total < static_cast<size_t>(length)) {
        size_t n = fread(buffer + total, 1, static_cast<size_t>(length) - total, file);
        if (n == 0) break;
        total += n;
    }
    bool failed = ferror(file) != 0;
    fclose(file);
    if (failed || total == 0) {
        free(buffer);
        return VC_REPORT(VC_ERROR_IO_FAILED);
    }

    int rc = VCImage_decodeFromJpeg(image, buffer, static_cast<int>(total));
    if (rc == 0) {
        free(buffer);
        return 0;
    }
    // A picture the caller has described already: the file holds its raw
    // pixels (the length is deliberately not compared with the geometry).
    // The decoder leaves a failed record as it found it, so this is the
    // caller's own description, never a header's promise.
    if (image->width >= 1 && image->height >= 1 && VCImage_size(image) != 0) {
        VF_LogMsg(VF_LOG_DEBUG, "Decoding as raw image: %dx%d '%4.4s'", image->width, image->height,
                  reinterpret_cast<const char*>(&image->format));
        VCImage_deallocate(image);
        image->data = buffer;
        image->size = static_cast<uint32_t>(total);
        VCPicture_setLastFailure(VC_DECODE_OK);
        return 0;
    }
    free(buffer);
    return rc;
}
