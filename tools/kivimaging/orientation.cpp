#include "orientation.h"

#include <libexif/exif-data.h>
#include <stdint.h>
#include <string.h>

namespace kivcli {

int orientationOfJpeg(const unsigned char* bytes, size_t length) {
    if (bytes == nullptr || length < 4 || length > UINT32_MAX) return 1;
    // libexif finds the EXIF block among the JPEG's markers itself.
    ExifData* exif = exif_data_new_from_data(bytes, static_cast<unsigned int>(length));
    if (exif == nullptr) return 1;
    int orientation = 1;
    ExifEntry* entry = exif_content_get_entry(exif->ifd[EXIF_IFD_0], EXIF_TAG_ORIENTATION);
    if (entry != nullptr && entry->format == EXIF_FORMAT_SHORT && entry->components == 1 &&
        entry->size >= 2) {
        int value = exif_get_short(entry->data, exif_data_get_byte_order(exif));
        if (value >= 1 && value <= 8) orientation = value;
    }
    exif_data_unref(exif);
    return orientation;
}

bool orientationFromHead(const unsigned char* bytes, size_t length, bool whole,
                         int* orientation) {
    *orientation = 1;
    if (whole || length < 2 || bytes[0] != 0xFF || bytes[1] != 0xD8) {
        *orientation = orientationOfJpeg(bytes, length);
        return true;
    }
    // The markers before the frame or the scan, EXIF among them.
    for (size_t at = 2; at + 4 <= length;) {
        if (bytes[at] != 0xFF) return false;
        const unsigned char marker = bytes[at + 1];
        if (marker == 0xFF) {
            at++;
            continue;
        }
        const bool frame = marker >= 0xC0 && marker <= 0xCF && marker != 0xC4 && marker != 0xC8 &&
                           marker != 0xCC;
        if (frame || marker == 0xDA) {
            *orientation = orientationOfJpeg(bytes, at);
            return true;
        }
        at += 2 + ((size_t)bytes[at + 2] << 8 | bytes[at + 3]);
    }
    return false;
}

namespace {

// How each orientation finds the stored pixel that shows at (x, y) once
// upright: take (y, x) instead of (x, y) when rows become columns, then
// count the column from the right and the row from the bottom where flipped.
struct Turn {
    bool swap, flipX, flipY;
};
const Turn kTurns[9] = {{},
                        {false, false, false},
                        {false, true, false},
                        {false, true, true},
                        {false, false, true},
                        {true, false, false},
                        {true, false, true},
                        {true, true, true},
                        {true, true, false}};

}  // namespace

VCImage* orientationApply(const VCImage* image, int orientation) {
    if (image == nullptr || image->data == nullptr || image->format != VC_FORMAT_RGBA ||
        orientation < 2 || orientation > 8)
        return nullptr;
    const Turn turn = kTurns[orientation];
    const int w = image->width, h = image->height;
    VCImage* out = VCImage_createNew(turn.swap ? h : w, turn.swap ? w : h, VC_FORMAT_RGBA);
    if (out == nullptr) return nullptr;
    const uint32_t* from = reinterpret_cast<const uint32_t*>(image->data);
    uint32_t* to = reinterpret_cast<uint32_t*>(out->data);
    for (int y = 0; y < out->height; ++y) {
        for (int x = 0; x < out->width; ++x) {
            int sx = turn.swap ? y : x, sy = turn.swap ? x : y;
            if (turn.flipX) sx = w - 1 - sx;
            if (turn.flipY) sy = h - 1 - sy;
            to[static_cast<size_t>(y) * out->width + x] = from[static_cast<size_t>(sy) * w + sx];
        }
    }
    return out;
}

}  // namespace kivcli
