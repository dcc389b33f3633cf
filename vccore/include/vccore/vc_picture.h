// What the decoders know about a compressed picture beyond a status code: its
// size read from the header alone, and why the last decoding failed.
#ifndef VCCORE_VC_PICTURE_H
#define VCCORE_VC_PICTURE_H

#include <stddef.h>

#include "vccore/vc_image.h"

#ifdef __cplusplus
extern "C" {
#endif

// Why a decoding failed. Status codes stay as they are; this says which of
// the many ways to fail behind VC_ERROR_CODEC_FAILED it was.
typedef enum VCDecodeFailure {
    VC_DECODE_OK = 0,
    VC_DECODE_NOT_A_PICTURE,       // neither a JPEG nor a PNG stream
    VC_DECODE_TRUNCATED,           // the stream ends before the picture does
    VC_DECODE_CORRUPT,             // damaged or inconsistent data
    VC_DECODE_UNSUPPORTED_COLOR,   // a colour space the decoders cannot turn into RGB
    VC_DECODE_UNSUPPORTED_CODING,  // a coding the decoders do not read (12-bit, lossless …)
    VC_DECODE_TOO_LARGE,           // more pixels than an image record can hold
    VC_DECODE_NO_MEMORY,           // an allocation failed
    VC_DECODE_NO_ROOM,             // the image's own buffer is too small for the picture
    VC_DECODE_CONVERSION,          // decoded, but not convertible into the image's format
    VC_DECODE_READ_FAILED,         // the file could not be opened or read
} VCDecodeFailure;

// The reason of the last VCImage_decodeFromJpeg, VCImage_loadFromFile or
// VCPicture_readHeader call on this thread; VC_DECODE_OK after a success.
VCDecodeFailure VCPicture_lastFailure(void);

// A short lower-case phrase for messages ("the data is truncated").
const char* VCPicture_failureText(VCDecodeFailure failure);

// Reads only the header of a JPEG or PNG stream: nothing of the picture's
// size is allocated. 0 with the width and height, or VC_ERROR_NULL_PARAM /
// VC_ERROR_CODEC_FAILED (reason in VCPicture_lastFailure).
int VCPicture_readHeader(const unsigned char* bytes, int length, int* width, int* height);

// Encodes a straight-alpha "RGBA" image (as decoded) as a PNG stream kept as
// it is: a malloc'ed buffer of *length bytes, or null (nothing logged).
// VCImage_saveToFile's PNG, by contrast, takes premultiplied pixels as read
// back from GL.
unsigned char* VCPicture_encodePng(const VCImage* image, size_t* length);

#ifdef __cplusplus
}
#endif

#endif
