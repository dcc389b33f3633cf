// EXIF orientation: cameras store pictures as the sensor saw them and say in
// the EXIF block how to turn them upright; every viewer honours it.
#ifndef TOOLS_KIVIMAGING_ORIENTATION_H
#define TOOLS_KIVIMAGING_ORIENTATION_H

#include <stddef.h>

#include "vccore/vc_image.h"

namespace kivcli {

// The EXIF orientation (1-8) of a JPEG stream; 1 (as stored) when it has
// none or an invalid one.
int orientationOfJpeg(const unsigned char* bytes, size_t length);
// The same from a stream's first `length` bytes (all of it when `whole`):
// false when they end before a JPEG's frame starts, where the EXIF block
// could still come.
bool orientationFromHead(const unsigned char* bytes, size_t length, bool whole, int* orientation);

// A new "RGBA" image: `image` ("RGBA") turned upright for `orientation`
// (1 as stored, 2 mirrored, 3 turned half round, 4 flipped, 5 transposed,
// 6 turned a quarter clockwise, 7 transversed, 8 a quarter anticlockwise).
// Null when out of memory or the orientation is not 2-8.
VCImage* orientationApply(const VCImage* image, int orientation);

}  // namespace kivcli

#endif
