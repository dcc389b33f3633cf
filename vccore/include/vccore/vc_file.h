// JPEG encoding and decoding, and image files.
#ifndef VCCORE_VC_FILE_H
#define VCCORE_VC_FILE_H

#include <stdio.h>

#include "vccore/vc_image.h"

#ifdef __cplusplus
extern "C" {
#endif

// A new "JPEG" image (size = stream length) or null; quality outside 1…100 is 85.
VCImage* VCImage_encodeToJpeg(const VCImage* image, int quality);
// The image's format chooses the output format; width and height come from the picture.
int VCImage_decodeFromJpeg(VCImage* image, const unsigned char* bytes, int length);
int VCImage_saveToFile(const VCImage* image, const char* path, int quality);
int VCImage_loadFromFile(VCImage* image, const char* path);

int save_to_file(const char* path, const unsigned char* bytes, int length);
long fsize(FILE* file);

#ifdef __cplusplus
}
#endif

#endif
