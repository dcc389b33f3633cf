// The image core's colour equations stated again for tests, independently of
// its code: full-range YUV to RGB in double precision, RGB to YUV in the 16.16
// fixed point the library specifies.
#ifndef KIV_TESTS_SUPPORT_COLOUR_MODEL_H
#define KIV_TESTS_SUPPORT_COLOUR_MODEL_H

namespace colour {

inline int clamp8(int v) {
    return v < 0 ? 0 : (v > 255 ? 255 : v);
}

inline void yuvToRgb(int y, int u, int v, int rgb[3]) {
    rgb[0] = clamp8(static_cast<int>(y + 1.402 * (v - 128)));
    rgb[1] = clamp8(static_cast<int>(y - 0.34414 * (u - 128) - 0.71414 * (v - 128)));
    rgb[2] = clamp8(static_cast<int>(y + 1.772 * (u - 128)));
}

inline int luma(int r, int g, int b) {
    return (19595 * r + 38470 * g + 7471 * b) >> 16;
}
inline int chromaU(int b, int y) {
    return clamp8(((36962 * (b - y)) >> 16) + 128);
}
inline int chromaV(int r, int y) {
    return clamp8(((46727 * (r - y)) >> 16) + 128);
}

}  // namespace colour

#endif
