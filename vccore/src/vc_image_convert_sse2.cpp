// SSE2 instantiation of the vector conversion kernels (the x86-64 baseline).
#if defined(__x86_64__)
#include <emmintrin.h>
#include <stddef.h>

#include "vc_image_convert_fast.h"
#include "vc_image_layout.h"

namespace {

struct Sse2 {
    using V = __m128i;
    static V zero() { return _mm_setzero_si128(); }
    static V load(const uint8_t* p) { return _mm_loadu_si128(reinterpret_cast<const V*>(p)); }
    static void store(uint8_t* p, V v) { _mm_storeu_si128(reinterpret_cast<V*>(p), v); }
    static void storeHalf(uint8_t* p, V v) { _mm_storel_epi64(reinterpret_cast<V*>(p), v); }
    static V set1_8(int v) { return _mm_set1_epi8(static_cast<char>(v)); }
    static V set1_16(int v) { return _mm_set1_epi16(static_cast<short>(v)); }
    static V set1_32(int v) { return _mm_set1_epi32(v); }
    static V pair16(int lo, int hi) {
        return _mm_set1_epi32(static_cast<int>((static_cast<uint32_t>(hi) << 16) |
                                               static_cast<uint16_t>(lo)));
    }
    static V add16(V a, V b) { return _mm_add_epi16(a, b); }
    static V sub16(V a, V b) { return _mm_sub_epi16(a, b); }
    static V add32(V a, V b) { return _mm_add_epi32(a, b); }
    static V sub32(V a, V b) { return _mm_sub_epi32(a, b); }
    static V and_(V a, V b) { return _mm_and_si128(a, b); }
    static V or_(V a, V b) { return _mm_or_si128(a, b); }
    static V srai32(V a, int n) { return _mm_srai_epi32(a, n); }
    static V slli32(V a, int n) { return _mm_slli_epi32(a, n); }
    static V slli16(V a, int n) { return _mm_slli_epi16(a, n); }
    static V srl32(V a, int n) { return _mm_srl_epi32(a, _mm_cvtsi32_si128(n)); }
    static V sll32(V a, int n) { return _mm_sll_epi32(a, _mm_cvtsi32_si128(n)); }
    static V madd16(V a, V b) { return _mm_madd_epi16(a, b); }
    static V packs32(V a, V b) { return _mm_packs_epi32(a, b); }
    static V packus16(V a, V b) { return _mm_packus_epi16(a, b); }
    static V unpacklo8(V a, V b) { return _mm_unpacklo_epi8(a, b); }
    static V unpackhi8(V a, V b) { return _mm_unpackhi_epi8(a, b); }
    static V unpacklo16(V a, V b) { return _mm_unpacklo_epi16(a, b); }
    static V unpackhi16(V a, V b) { return _mm_unpackhi_epi16(a, b); }
    static bool anyEq32(V a, V b) { return _mm_movemask_epi8(_mm_cmpeq_epi32(a, b)) != 0; }
    static V fixPackOrder(V v) { return v; }
    // kBytes / 2 U bytes and as many V bytes, interleaved U, V, U, V …
    static V interleave(const uint8_t* u, const uint8_t* v) {
        return _mm_unpacklo_epi8(_mm_loadl_epi64(reinterpret_cast<const V*>(u)),
                                 _mm_loadl_epi64(reinterpret_cast<const V*>(v)));
    }
    // Four byte planes (byte 0 … byte 3 of every pixel) to 16 pixels.
    static void store4(uint8_t* p, V b0, V b1, V b2, V b3) {
        const V t0 = _mm_unpacklo_epi8(b0, b1);
        const V t1 = _mm_unpackhi_epi8(b0, b1);
        const V t2 = _mm_unpacklo_epi8(b2, b3);
        const V t3 = _mm_unpackhi_epi8(b2, b3);
        store(p, _mm_unpacklo_epi16(t0, t2));
        store(p + 16, _mm_unpackhi_epi16(t0, t2));
        store(p + 32, _mm_unpacklo_epi16(t1, t3));
        store(p + 48, _mm_unpackhi_epi16(t1, t3));
    }
};

#include "vc_image_convert_kernels.h"

}  // namespace

bool VCConvert_sse2(const VCImage* source, VCImage* destination) {
    return Kernels<Sse2>::convert(source, destination);
}
#endif
