// Internal pieces of the colour conversion: the reference per-pixel arithmetic
// shared by every path, and the vectorised fast paths chosen at run time.
#ifndef VCCORE_VC_IMAGE_CONVERT_FAST_H
#define VCCORE_VC_IMAGE_CONVERT_FAST_H

#include <stdint.h>

#include "vccore/vc_image.h"

static inline uint8_t VCConvert_clamp(int value) {
    if (value < 0) return 0;
    if (value > 255) return 255;
    return static_cast<uint8_t>(value);
}

// Full-range YUV to RGB in double precision; results truncate toward zero and
// are then clamped. u and v are the raw chroma bytes.
static inline void VCConvert_yuvToRgb(int y, int u, int v, uint8_t* r, uint8_t* g, uint8_t* b) {
    const double Y = y;
    const double U = u - 128;
    const double V = v - 128;
    *r = VCConvert_clamp(static_cast<int>(Y + 1.402 * V));
    *g = VCConvert_clamp(static_cast<int>(Y - 0.34414 * U - 0.71414 * V));
    *b = VCConvert_clamp(static_cast<int>(Y + 1.772 * U));
}

// Full-range RGB to YUV with 16-bit fixed-point coefficients.
static inline uint8_t VCConvert_rgbToY(int r, int g, int b) {
    return VCConvert_clamp((19595 * r + 38470 * g + 7471 * b) >> 16);
}
static inline uint8_t VCConvert_rgbToU(int b, int y) {
    return VCConvert_clamp(((36962 * (b - y)) >> 16) + 128);
}
static inline uint8_t VCConvert_rgbToV(int r, int y) {
    return VCConvert_clamp(((46727 * (r - y)) >> 16) + 128);
}

// Integer model of the YUV to RGB arithmetic the vector paths use. The chroma
// terms are exact floors of the real products; one chroma pair (U 28, V 228)
// lands exactly on an integer for green, where the double evaluation falls a
// hair short for some luma values, and is corrected explicitly.
enum {
    kVCConvertShift = 16,
    kVCConvertRV = 91882,   // 1.402 * 2^16, chosen so that every floor matches
    kVCConvertBU = 116130,  // 1.772 * 2^16
    // Green needs more fraction bits: its exact values sit 1e-5 apart.
    kVCConvertGShift = 20,
    kVCConvertGU = -360857,  // -0.34414 * 2^20
    kVCConvertGV = -748830,  // -0.71414 * 2^20
    kVCConvertGBias = 16,
    kVCConvertGFixU = 28,
    kVCConvertGFixV = 228,
    kVCConvertGFixLow = 94,
    kVCConvertGFixHigh = 165,
};

static inline void VCConvert_yuvToRgbFixed(int y, int u, int v, uint8_t* r, uint8_t* g,
                                           uint8_t* b) {
    const int U = u - 128;
    const int V = v - 128;
    const int rOff = (kVCConvertRV * V) >> kVCConvertShift;
    const int bOff = (kVCConvertBU * U) >> kVCConvertShift;
    const int gOff = (kVCConvertGU * U + kVCConvertGV * V + kVCConvertGBias) >> kVCConvertGShift;
    int gFix = 0;
    if (u == kVCConvertGFixU && v == kVCConvertGFixV && y >= kVCConvertGFixLow &&
        y <= kVCConvertGFixHigh)
        gFix = -1;
    *r = VCConvert_clamp(y + rOff);
    *g = VCConvert_clamp(y + gOff + gFix);
    *b = VCConvert_clamp(y + bOff);
}

// Vector levels of the fast paths. Levels count per architecture: NEON is
// the first (and only) vector level on arm64.
enum { kVCConvertScalar = 0, kVCConvertSse2 = 1, kVCConvertAvx2 = 2, kVCConvertNeon = 1 };

// Best level this machine supports.
int VCConvert_cpuLevel(void);
// Caps the level used by VCImage_convert (tests compare the levels); returns
// the level now in effect.
int VCConvert_setLevel(int level);
int VCConvert_level(void);

// Tries a vector path for the pair; true when it converted. The images have
// already passed every check of VCImage_convert and have the same geometry;
// odd 4:2:x geometry is left to the reference loops (false).
bool VCConvert_fast(const VCImage* source, VCImage* destination);

#endif
