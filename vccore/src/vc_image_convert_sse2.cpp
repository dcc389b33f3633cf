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
    template <bool kStream = false>
    static void store(uint8_t* p, V v) {
        if (kStream)
            _mm_stream_si128(reinterpret_cast<V*>(p), v);
        else
            _mm_storeu_si128(reinterpret_cast<V*>(p), v);
    }
    static bool streamable(const uint8_t* p) { return (reinterpret_cast<uintptr_t>(p) & 15) == 0; }
    static void fence() { _mm_sfence(); }
    static void storeHalf(uint8_t* p, V v) { _mm_storel_epi64(reinterpret_cast<V*>(p), v); }
    static V set1_8(int v) { return _mm_set1_epi8(static_cast<char>(v)); }
    static V set1_16(int v) { return _mm_set1_epi16(static_cast<short>(v)); }
    static V set1_32(int v) { return _mm_set1_epi32(v); }
    static V pair16(int lo, int hi) {
        return _mm_set1_epi32(
            static_cast<int>((static_cast<uint32_t>(hi) << 16) | static_cast<uint16_t>(lo)));
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
    static V srli32(V a, int n) { return _mm_srli_epi32(a, n); }
    // Byte moves inside every 4-byte pixel, by shifts and masks (SSE2 has no
    // byte shuffle).
    struct Shuffle {
        V in[4];
        V out[4];
    };
    static Shuffle makeShuffle(int f0, int f1, int f2, int f3) {
        const int from[4] = {f0, f1, f2, f3};
        Shuffle s;
        for (int k = 0; k < 4; ++k) {
            s.in[k] = _mm_cvtsi32_si128(8 * from[k]);
            s.out[k] = _mm_cvtsi32_si128(8 * k);
        }
        return s;
    }
    static V shuffle(V p, const Shuffle& s) {
        const V ff = _mm_set1_epi32(0xff);
        V out = _mm_setzero_si128();
        for (int k = 0; k < 4; ++k)
            out = _mm_or_si128(
                out, _mm_sll_epi32(_mm_and_si128(_mm_srl_epi32(p, s.in[k]), ff), s.out[k]));
        return out;
    }
    static V srli16(V a, int n) { return _mm_srli_epi16(a, n); }
    static V min16(V a, V b) { return _mm_min_epi16(a, b); }
    static V max16(V a, V b) { return _mm_max_epi16(a, b); }
    // Even 32-bit lanes of a, with the even lanes of b in between.
    static V combineEven(V a, V b) {
        return _mm_or_si128(_mm_and_si128(a, _mm_set_epi32(0, -1, 0, -1)), _mm_slli_epi64(b, 32));
    }
    // Words a0 b0 a2 b2 c0 d0 c2 d2 (of four 4-pixel vectors) to pixel order.
    static V pairOrder(V w) { return _mm_shufflehi_epi16(_mm_shufflelo_epi16(w, 0xD8), 0xD8); }
    static V mulhi16(V a, V b) { return _mm_mulhi_epi16(a, b); }
    static V addsu8(V a, V b) { return _mm_adds_epu8(a, b); }
    static V subsu8(V a, V b) { return _mm_subs_epu8(a, b); }
    static V cmpeq16(V a, V b) { return _mm_cmpeq_epi16(a, b); }
    static bool any(V a) { return _mm_movemask_epi8(a) != 0; }
    static V mullo16(V a, V b) { return _mm_mullo_epi16(a, b); }
    static V toStoreOrder(V v) { return v; }
    static V madd16(V a, V b) { return _mm_madd_epi16(a, b); }
    static V packs32(V a, V b) { return _mm_packs_epi32(a, b); }
    static V packus16(V a, V b) { return _mm_packus_epi16(a, b); }
    static V unpacklo8(V a, V b) { return _mm_unpacklo_epi8(a, b); }
    static V unpackhi8(V a, V b) { return _mm_unpackhi_epi8(a, b); }
    static V fixPackOrder(V v) { return v; }
    // kBytes / 2 U bytes and as many V bytes, interleaved U, V, U, V …
    static V interleave(const uint8_t* u, const uint8_t* v) {
        return _mm_unpacklo_epi8(_mm_loadl_epi64(reinterpret_cast<const V*>(u)),
                                 _mm_loadl_epi64(reinterpret_cast<const V*>(v)));
    }
    // Four byte planes (byte 0 … byte 3 of every pixel) to 16 pixels.
    template <bool kStream>
    static void store4(uint8_t* p, V b0, V b1, V b2, V b3) {
        const V t0 = _mm_unpacklo_epi8(b0, b1);
        const V t1 = _mm_unpackhi_epi8(b0, b1);
        const V t2 = _mm_unpacklo_epi8(b2, b3);
        const V t3 = _mm_unpackhi_epi8(b2, b3);
        store<kStream>(p, _mm_unpacklo_epi16(t0, t2));
        store<kStream>(p + 16, _mm_unpackhi_epi16(t0, t2));
        store<kStream>(p + 32, _mm_unpacklo_epi16(t1, t3));
        store<kStream>(p + 48, _mm_unpackhi_epi16(t1, t3));
    }
};

#include "vc_image_convert_kernels.h"

}  // namespace

bool VCConvert_sse2(const VCImage* source, VCImage* destination) {
    return Kernels<Sse2>::convert(source, destination);
}
#endif
