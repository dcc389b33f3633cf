// SSE2 instantiation of the vector conversion kernels (the x86-64 baseline).
#if defined(__x86_64__)
#include <emmintrin.h>
#include <stddef.h>
#include <string.h>

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
    static void fence() { _mm_sfence(); }
    static void storeHalf(uint8_t* p, V v) { _mm_storel_epi64(reinterpret_cast<V*>(p), v); }
    static V set1_8(int v) { return _mm_set1_epi8(static_cast<char>(v)); }
    static V pair8(int lo, int hi) { return _mm_set1_epi16(static_cast<short>(hi << 8 | lo)); }
    static V set1_16(int v) { return _mm_set1_epi16(static_cast<short>(v)); }
    static V set1_32(int v) { return _mm_set1_epi32(v); }
    static V pair16(int lo, int hi) {
        return _mm_set1_epi32(
            static_cast<int>((static_cast<uint32_t>(hi) << 16) | static_cast<uint16_t>(lo)));
    }
    static V add16(V a, V b) { return _mm_add_epi16(a, b); }
    static V max16(V a, V b) { return _mm_max_epi16(a, b); }
    static V mullo16(V a, V b) { return _mm_mullo_epi16(a, b); }
    static V sub16(V a, V b) { return _mm_sub_epi16(a, b); }
    static V add32(V a, V b) { return _mm_add_epi32(a, b); }
    static V and_(V a, V b) { return _mm_and_si128(a, b); }
    static V xor_(V a, V b) { return _mm_xor_si128(a, b); }
    static V srai16(V a, int n) { return _mm_srai_epi16(a, n); }
    // Unsigned bytes of a times signed bytes of b, adjacent products summed
    // into words. SSE2 has no such instruction: two word products instead
    // (the kernels' sums always fit a word, so no saturation is lost).
    static V maddubs(V a, V b) {
        const V aEven = _mm_and_si128(a, _mm_set1_epi16(0xff));
        const V aOdd = _mm_srli_epi16(a, 8);
        const V bEven = _mm_srai_epi16(_mm_slli_epi16(b, 8), 8);
        const V bOdd = _mm_srai_epi16(b, 8);
        return _mm_add_epi16(_mm_mullo_epi16(aEven, bEven), _mm_mullo_epi16(aOdd, bOdd));
    }
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
    // Dwords 0 and 2 of a, then those of b.
    static V evenPixels(V a, V b) {
        return _mm_castps_si128(_mm_shuffle_ps(_mm_castsi128_ps(a), _mm_castsi128_ps(b), 0x88));
    }
    // Bytes I and J of every 4-byte group as its two words; I and J share a
    // parity (a mask or a shift picks them, a word shuffle orders them).
    template <int I, int J>
    static V words(V p) {
        static_assert(I % 2 == J % 2, "bytes of one parity");
        const V both =
            I % 2 == 0 ? _mm_and_si128(p, _mm_set1_epi32(0x00ff00ff)) : _mm_srli_epi16(p, 8);
        constexpr int a = I / 2, b = J / 2;
        if (a == 0 && b == 1) return both;
        constexpr int order = _MM_SHUFFLE(b + 2, a + 2, b, a);
        return _mm_shufflehi_epi16(_mm_shufflelo_epi16(both, order), order);
    }
    static V mulhi16(V a, V b) { return _mm_mulhi_epi16(a, b); }
    static V addsu8(V a, V b) { return _mm_adds_epu8(a, b); }
    static V subsu8(V a, V b) { return _mm_subs_epu8(a, b); }
    static V cmpeq16(V a, V b) { return _mm_cmpeq_epi16(a, b); }
    static bool any(V a) { return _mm_movemask_epi8(a) != 0; }
    static V toStoreOrder(V v) { return v; }
    static V madd16(V a, V b) { return _mm_madd_epi16(a, b); }
    static V packs32(V a, V b) { return _mm_packs_epi32(a, b); }
    static V packus16(V a, V b) { return _mm_packus_epi16(a, b); }
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
