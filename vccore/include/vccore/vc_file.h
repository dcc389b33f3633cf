// JPEG encoding and decoding, and image files.
#ifndef VCCORE_VC_FILE_H
#define VCCORE_VC_FILE_H

#include <stddef.h>
#include <stdio.h>

#include "vccore/vc_image.h"

#ifdef __cplusplus
extern "C" {
#endif

// A new owning "JPEG" image (data = stream, size = stream length, width and
// height of the picture) or null. Quality outside 1…100 is replaced by 85.
// The platform fast codec "libkivjpeginterface.so" is used when installed.
VCImage* VCImage_encodeToJpeg(const VCImage* image, int quality);

// Decodes a JPEG or PNG stream. The image's format chooses the output format;
// its width and height are set from the picture. An image without a buffer
// gets one; an image with a buffer must be large enough for the result.
int VCImage_decodeFromJpeg(VCImage* image, const unsigned char* bytes, int length);

// The path's extension picks the file type (case-insensitive substring tests in
// this order): ".jpeg", ".jpg" → JPEG at `quality`; ".png" → PNG; otherwise the
// raw buffer, `size` field bytes long. A failed JPEG encoding still returns 0
// (it is only logged). PNG files are written from premultiplied RGBA, as read
// back from GL, and store straight alpha.
int VCImage_saveToFile(const VCImage* image, const char* path, int quality);

// Decodes a JPEG or PNG file into the image. When that fails and the image
// already has a geometry and a format, the file is taken as raw pixels.
int VCImage_loadFromFile(VCImage* image, const char* path);

// Writes a byte block to a file, created with mode 0777 and not truncated
// (a longer existing file keeps its tail). Failures are only logged.
void save_to_file(const char* path, const unsigned char* bytes, size_t length);

// Byte length of an open file, its position restored; -1 on any failure.
long fsize(FILE* file);

#ifdef __cplusplus
}
#endif

#endif
