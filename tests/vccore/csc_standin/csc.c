// Stand-in for the hardware BGRA to NV12 library: fills the planes with bytes
// taken from the first source pixel so that the caller can tell which entry
// ran and where it wrote. KIV_CSC_NEON and KIV_CSC_PLAIN choose the entries
// it exports; with neither it exports none.

#if defined(KIV_CSC_NEON) || defined(KIV_CSC_PLAIN)
static void fill(unsigned char* y, unsigned char* uv, const unsigned char* rgb, unsigned int w,
                 unsigned int h, unsigned char tag) {
    for (unsigned int i = 0; i < w * h; ++i) y[i] = rgb[0] ^ tag;
    for (unsigned int i = 0; i < w * h / 2; ++i) uv[i] = rgb[1] ^ tag;
}
#endif

#ifdef KIV_CSC_NEON
void csc_ARGB8888_to_YUV420SP_NEON(unsigned char* y, unsigned char* uv, unsigned char* rgb,
                                   unsigned int w, unsigned int h) {
    fill(y, uv, rgb, w, h, 0x0F);
}
#endif

#ifdef KIV_CSC_PLAIN
void csc_ARGB8888_to_YUV420SP(unsigned char* y, unsigned char* uv, unsigned char* rgb,
                              unsigned int w, unsigned int h) {
    fill(y, uv, rgb, w, h, 0xF0);
}
#endif

// Something to export when no entry is (a library of nothing at all).
int csc_standin_marker(void) {
    return 0;
}
