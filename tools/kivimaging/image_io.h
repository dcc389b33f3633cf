// Reading and writing picture files for the tool, with messages a person can act on.
#ifndef TOOLS_KIVIMAGING_IMAGE_IO_H
#define TOOLS_KIVIMAGING_IMAGE_IO_H

#include <string>

#include "vccore/vc_image.h"

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
    ImageHolder(const ImageHolder&) = delete;
    ImageHolder& operator=(const ImageHolder&) = delete;

private:
    VCImage* mImage;
};

// True when the path names a format the tool writes: .png, .jpg, .jpeg (any case).
bool imageWritableFormat(const std::string& path);

// Decodes a JPEG or PNG file into a new "RGBA" image; null with a message for
// a missing, unreadable, empty or undecodable file.
VCImage* imageLoadRgba(const std::string& path, std::string* error);

// Writes an image as PNG or JPEG by the path's extension, replacing any file
// there; false with a message when the format is not one of ours or nothing
// usable was written.
bool imageSave(const VCImage* image, const std::string& path, int quality, std::string* error);

}  // namespace kivcli

#endif
