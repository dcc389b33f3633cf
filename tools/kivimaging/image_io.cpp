#include "image_io.h"

#include <stdlib.h>
#include <string.h>
#include <strings.h>

#include "file_io.h"
#include "orientation.h"
#include "vccore/vc_file.h"
#include "vccore/vc_picture.h"

namespace kivcli {
namespace {

bool endsWith(const std::string& s, const char* suffix) {
    size_t n = strlen(suffix);
    return s.size() >= n && strcasecmp(s.c_str() + s.size() - n, suffix) == 0;
}

}  // namespace

ImageFileFormat imageFileFormat(const std::string& path) {
    if (endsWith(path, ".png")) return ImageFileFormat::kPng;
    if (endsWith(path, ".jpg") || endsWith(path, ".jpeg")) return ImageFileFormat::kJpeg;
    return ImageFileFormat::kNone;
}

std::string imageDecodeError(const std::string& path, VCDecodeFailure why) {
    return "cannot decode '" + path + "': " + VCPicture_failureText(why);
}

VCImage* imageLoadRgba(const std::string& path, std::string* error, int maxSide) {
    FileBytes bytes;
    if (!fileReadPicture(path, &bytes, error)) return nullptr;
    return imageDecodeRgba(bytes, path, error, maxSide);
}

VCImage* imageDecodeRgba(const FileBytes& bytes, const std::string& path, std::string* error,
                         int maxSide) {
    const int length = static_cast<int>(bytes.size());
    int width = 0, height = 0;
    if (maxSide > 0 && VCPicture_readHeader(bytes.data(), length, &width, &height) == VC_OK &&
        (width > maxSide || height > maxSide)) {
        *error = "cannot process '" + path + "': " + std::to_string(width) + "x" +
                 std::to_string(height) + " is larger than this GPU's " + std::to_string(maxSide) +
                 " limit";
        return nullptr;
    }
    ImageHolder image(VCImage_createEmpty(0, 0, VC_FORMAT_RGBA));
    if (image.get() == nullptr ||
        VCImage_decodeFromJpeg(image.get(), bytes.data(), length) != VC_OK) {
        *error = imageDecodeError(path, VCPicture_lastFailure());
        return nullptr;
    }
    int orientation = orientationOfJpeg(bytes.data(), bytes.size());
    if (orientation != 1) {
        image.reset(orientationApply(image.get(), orientation));
        if (image.get() == nullptr) {
            *error = "cannot turn '" + path + "' upright: out of memory";
            return nullptr;
        }
    }
    return image.release();
}

bool imageSave(const VCImage* image, const std::string& path, int quality, std::string* error) {
    ImageFileFormat format = imageFileFormat(path);
    unsigned char* stream = nullptr;
    size_t length = 0;
    VCImage* jpeg = nullptr;
    if (format == ImageFileFormat::kPng) {
        stream = VCPicture_encodePng(image, &length);
    } else if (format == ImageFileFormat::kJpeg) {
        jpeg = VCImage_encodeToJpeg(image, quality);
        if (jpeg != nullptr) {
            stream = jpeg->data;
            length = jpeg->size;
        }
    } else {
        *error = "cannot write '" + path + "': the name must end in .png, .jpg or .jpeg";
        return false;
    }
    bool ok = stream != nullptr && length > 0;
    if (!ok) {
        *error = "cannot write '" + path + "': the picture could not be encoded";
    } else {
        ok = fileWriteAtomic(path, stream, length, error);
    }
    if (jpeg != nullptr) {
        VCImage_destroy(jpeg);
    } else {
        free(stream);
    }
    return ok;
}

}  // namespace kivcli
