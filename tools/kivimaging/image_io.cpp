#include "image_io.h"

#include <errno.h>
#include <stdio.h>
#include <string.h>
#include <strings.h>
#include <sys/stat.h>
#include <unistd.h>

#include "vccore/vc_file.h"

namespace kivcli {
namespace {

bool endsWith(const std::string& s, const char* suffix) {
    size_t n = strlen(suffix);
    return s.size() >= n && strcasecmp(s.c_str() + s.size() - n, suffix) == 0;
}

}  // namespace

bool imageWritableFormat(const std::string& path) {
    return endsWith(path, ".png") || endsWith(path, ".jpg") || endsWith(path, ".jpeg");
}

VCImage* imageLoadRgba(const std::string& path, std::string* error) {
    struct stat st;
    if (stat(path.c_str(), &st) != 0) {
        *error = "cannot read '" + path + "': " + strerror(errno);
        return nullptr;
    }
    if (S_ISDIR(st.st_mode)) {
        *error = "cannot read '" + path + "': it is a directory";
        return nullptr;
    }
    if (access(path.c_str(), R_OK) != 0) {
        *error = "cannot read '" + path + "': " + strerror(errno);
        return nullptr;
    }
    if (st.st_size == 0) {
        *error = "cannot read '" + path + "': the file is empty";
        return nullptr;
    }
    // Width and height stay 0 so that an undecodable file is not taken as raw pixels.
    VCImage* image = VCImage_createEmpty(0, 0, VC_FORMAT_RGBA);
    int rc = VCImage_loadFromFile(image, path.c_str());
    if (rc != VC_OK || image->data == nullptr || image->width < 1 || image->height < 1) {
        *error = "cannot decode '" + path + "' as a JPEG or PNG picture (" +
                 (rc != VC_OK ? VCError_name(rc) : "no pixels") + ")";
        VCImage_destroy(image);
        return nullptr;
    }
    return image;
}

bool imageSave(const VCImage* image, const std::string& path, int quality, std::string* error) {
    if (!imageWritableFormat(path)) {
        *error = "cannot write '" + path + "': the name must end in .png, .jpg or .jpeg";
        return false;
    }
    // The library writes JPEG streams over an existing file without truncating it.
    if (unlink(path.c_str()) != 0 && errno != ENOENT) {
        *error = "cannot replace '" + path + "': " + strerror(errno);
        return false;
    }
    int rc = VCImage_saveToFile(image, path.c_str(), quality);
    struct stat st;
    if (rc != VC_OK || stat(path.c_str(), &st) != 0 || st.st_size == 0) {
        *error = "cannot write '" + path + "'" +
                 (rc != VC_OK ? std::string(" (") + VCError_name(rc) + ")"
                              : std::string(" (nothing was written; is the folder writable?)"));
        return false;
    }
    return true;
}

}  // namespace kivcli
