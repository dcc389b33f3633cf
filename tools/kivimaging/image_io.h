// Reading and writing picture files for the tool, with messages a person can act on.
#ifndef TOOLS_KIVIMAGING_IMAGE_IO_H
#define TOOLS_KIVIMAGING_IMAGE_IO_H

#include <string>
#include <vector>

#include "vccore/vc_image.h"
#include "vccore/vc_picture.h"

namespace kivcli {

constexpr int kDefaultJpegQuality = 98;

// Owns one VCImage and destroys it.
class ImageHolder {
public:
    explicit ImageHolder(VCImage* image = nullptr) : mImage(image) {}
    ~ImageHolder() { VCImage_destroy(mImage); }
    VCImage* get() const { return mImage; }
    void reset(VCImage* image) {
        VCImage_destroy(mImage);
        mImage = image;
    }
    // Hands the image over to the caller.
    VCImage* release() {
        VCImage* image = mImage;
        mImage = nullptr;
        return image;
    }
    ImageHolder(const ImageHolder&) = delete;
    ImageHolder& operator=(const ImageHolder&) = delete;

private:
    VCImage* mImage;
};

// The formats the tool writes, told by the name's last extension (any case).
enum class ImageFileFormat { kNone, kPng, kJpeg };
ImageFileFormat imageFileFormat(const std::string& path);
inline bool imageWritableFormat(const std::string& path) {
    return imageFileFormat(path) != ImageFileFormat::kNone;
}

// Decodes a JPEG or PNG file into a new "RGBA" image, turned upright as its
// EXIF orientation says. With `maxSide` > 0 a picture wider or taller than
// that is refused from its header, before anything is decoded. Null with a
// message naming the path and the reason otherwise.
VCImage* imageLoadRgba(const std::string& path, std::string* error, int maxSide = 0);
// The same from the file's bytes (`path` only names it in messages).
VCImage* imageDecodeRgba(const std::vector<unsigned char>& bytes, const std::string& path,
                         std::string* error, int maxSide = 0);
// The message for a picture that did not decode.
std::string imageDecodeError(const std::string& path, VCDecodeFailure why);

// Writes an "RGBA" image (straight alpha, as decoded and rendered) as PNG or
// JPEG by the path's extension, replacing any file there only once the new
// one is complete. False with a message naming the path and the reason.
bool imageSave(const VCImage* image, const std::string& path, int quality, std::string* error);

}  // namespace kivcli

#endif
