// Stand-in for the hardware BGRA to NV12 library: fills the planes with bytes
// taken from the first source pixel so that the caller can tell which entry
// ran and where it wrote. KIV_CSC_NEON builds the NEON-named entry instead.

static void fill(unsigned char* y, unsigned char* uv, const unsigned char* rgb, unsigned int w,
                 unsigned int h, unsigned char tag) {
    for (unsigned int i = 0; i < w * h; ++i) y[i] = rgb[0] ^ tag;
    for (unsigned int i = 0; i < w * h / 2; ++i) uv[i] = rgb[1] ^ tag;
}

#ifdef KIV_CSC_NEON
void csc_ARGB8888_to_YUV420SP_NEON(unsigned char* y, unsigned char* uv, unsigned char* rgb,
                                   unsigned int w, unsigned int h) {
    fill(y, uv, rgb, w, h, 0x0F);
}
#else
void csc_ARGB8888_to_YUV420SP(unsigned char* y, unsigned char* uv, unsigned char* rgb,
                              unsigned int w, unsigned int h) {
    fill(y, uv, rgb, w, h, 0xF0);
}
#endif
