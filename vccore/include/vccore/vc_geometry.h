// Scaling, cropping, rotating by right angles and pasting image records.
// All return 0 or a negative VC_ERROR_* code, logged where it arises.
#ifndef VCCORE_VC_GEOMETRY_H
#define VCCORE_VC_GEOMETRY_H

#include "vccore/vc_image.h"

#ifdef __cplusplus
extern "C" {
#endif

// Nearest-neighbour scaling of an "RGBA" image to the destination's width and
// height (the destination is allocated when it has no buffer). Each
// destination pixel centre (x + 0.5, y + 0.5) is divided by the single-precision
// scale factors dst/src and takes the source pixel it falls in. Pixels are
// copied as they are (no premultiplication, no filtering).
int VCImage_scale(const VCImage* source, VCImage* destination);

// The same nearest-neighbour sampling over one plane of tightly packed
// samples of bytesPerSample bytes (1 for luma or a planar chroma plane, 2 for
// interleaved chroma pairs, 4 for RGBA), so YUV pictures resize plane by
// plane exactly as RGBA ones do. Returns 0, or VC_ERROR_NULL_PARAM /
// VC_ERROR_INVALID_SIZE for missing planes or non-positive sizes.
int VCImage_scalePlane(const uint8_t* source, int sourceWidth, int sourceHeight,
                       uint8_t* destination, int destinationWidth, int destinationHeight,
                       int bytesPerSample);

// Copies the destination-sized rectangle at (x, y) of the source into the
// destination (allocated when it has no buffer). RGB formats at any offset;
// 4:2:0 formats at even offsets and even sizes only.
int VCImage_crop(const VCImage* source, VCImage* destination, int x, int y);

// Rotates in place by a multiple of 90 degrees (counter-clockwise on screen
// for positive angles). Images other than "RGBA" go through a temporary
// "RGBA" copy; only a failure to make that copy is returned.
int VCImage_rotate(VCImage* image, int angle);

// Pastes the source into the destination with its top-left corner at (x, y),
// clipped to the destination. With a negative offset the source's leading
// -x columns (or -y rows) are the ones cut off: the destination shows the
// part of the source that lies inside it, as if the whole source were drawn
// at (x, y). Pasting entirely outside, or a clip that leaves nothing, is not
// an error (a warning is logged and 0 returned). 4:2:0 pastes need even
// offsets and an even source size.
int VCImage_drawImage(const VCImage* source, VCImage* destination, int x, int y);

#ifdef __cplusplus
}
#endif

#endif
