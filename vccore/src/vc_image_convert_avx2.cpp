// AVX2 instantiation of the vector conversion kernels; built with -mavx2 and
// only entered after a run-time check of the CPU.
#if defined(__x86_64__)
#include <immintrin.h>
#include <stddef.h>
#include <string.h>

#include "vc_image_convert_fast.h"
#include "vc_image_layout.h"

namespace {

struct Avx2 {
    using V = __m256i;
    static V zero() { return _mm256_setzero_si256(); }
    static V load(const uint8_t* p) { return _mm256_loadu_si256(reinterpret_cast<const V*>(p)); }
    // The kernels stream only to 64-byte-aligned lines.
    template <bool kStream = false>
    static void store(uint8_t* p, V v) {
        if (kStream)
            _mm256_stream_si256(reinterpret_cast<V*>(p), v);
        else
            _mm256_storeu_si256(reinterpret_cast<V*>(p), v);
    }
    static void fence() { _mm_sfence(); }
    static void storeHalf(uint8_t* p, V v) {
        // Quadwords 0 and 2 hold the bytes of the two 128-bit lanes.
        _mm_storeu_si128(reinterpret_cast<__m128i*>(p),
                         _mm256_castsi256_si128(_mm256_permute4x64_epi64(v, 0x08)));
    }
    static V set1_8(int v) { return _mm256_set1_epi8(static_cast<char>(v)); }
    static V pair8(int lo, int hi) { return _mm256_set1_epi16(static_cast<short>(hi << 8 | lo)); }
    static V set1_16(int v) { return _mm256_set1_epi16(static_cast<short>(v)); }
    static V set1_32(int v) { return _mm256_set1_epi32(v); }
    static V pair16(int lo, int hi) {
        return _mm256_set1_epi32(
            static_cast<int>((static_cast<uint32_t>(hi) << 16) | static_cast<uint16_t>(lo)));
    }
    static V add16(V a, V b) { return _mm256_add_epi16(a, b); }
    static V max16(V a, V b) { return _mm256_max_epi16(a, b); }
    static V mullo16(V a, V b) { return _mm256_mullo_epi16(a, b); }
    static V sub16(V a, V b) { return _mm256_sub_epi16(a, b); }
    static V add32(V a, V b) { return _mm256_add_epi32(a, b); }
    static V and_(V a, V b) { return _mm256_and_si256(a, b); }
    static V xor_(V a, V b) { return _mm256_xor_si256(a, b); }
    static V srai16(V a, int n) { return _mm256_srai_epi16(a, n); }
    // Unsigned bytes of a times signed bytes of b, adjacent products summed
    // into words (saturating, which the kernels' sums never need).
    static V maddubs(V a, V b) { return _mm256_maddubs_epi16(a, b); }
    static V slli16(V a, int n) { return _mm256_slli_epi16(a, n); }
    static V srli32(V a, int n) { return _mm256_srli_epi32(a, n); }
    // Byte moves inside every 4-byte pixel: one byte shuffle.
    using Shuffle = V;
    static Shuffle makeShuffle(int f0, int f1, int f2, int f3) {
        alignas(32) int8_t mask[32];
        const int from[4] = {f0, f1, f2, f3};
        for (int i = 0; i < 32; ++i) mask[i] = static_cast<int8_t>((i % 16) / 4 * 4 + from[i % 4]);
        return _mm256_load_si256(reinterpret_cast<const V*>(mask));
    }
    static V shuffle(V p, const Shuffle& s) { return _mm256_shuffle_epi8(p, s); }
    static V srli16(V a, int n) { return _mm256_srli_epi16(a, n); }
    // Dwords 0 and 2 of every 128-bit lane of a, then those of b.
    static V evenPixels(V a, V b) {
        return _mm256_castps_si256(
            _mm256_shuffle_ps(_mm256_castsi256_ps(a), _mm256_castsi256_ps(b), 0x88));
    }
    // Bytes I and J of every 4-byte group as its two words.
    template <int I, int J>
    static V words(V p) {
        if (I == 0 && J == 2) return _mm256_and_si256(p, _mm256_set1_epi32(0x00ff00ff));
        if (I == 1 && J == 3) return _mm256_srli_epi16(p, 8);
        return _mm256_shuffle_epi8(
            p, _mm256_setr_epi8(I, -1, J, -1, I + 4, -1, J + 4, -1, I + 8, -1, J + 8, -1, I + 12,
                                -1, J + 12, -1, I, -1, J, -1, I + 4, -1, J + 4, -1, I + 8, -1,
                                J + 8, -1, I + 12, -1, J + 12, -1));
    }
    static V mulhi16(V a, V b) { return _mm256_mulhi_epi16(a, b); }
    static V addsu8(V a, V b) { return _mm256_adds_epu8(a, b); }
    static V subsu8(V a, V b) { return _mm256_subs_epu8(a, b); }
    static V cmpeq16(V a, V b) { return _mm256_cmpeq_epi16(a, b); }
    static bool any(V a) { return _mm256_movemask_epi8(a) != 0; }
    // Groups of 4 pixels (4 bytes of a byte plane) as 0 2 4 6 | 1 3 5 7, so
    // that the in-lane unpacks of store4 yield 8 consecutive pixels per
    // vector.
    static V toStoreOrder(V v) {
        return _mm256_permutevar8x32_epi32(v, _mm256_setr_epi32(0, 2, 4, 6, 1, 3, 5, 7));
    }
    static V madd16(V a, V b) { return _mm256_madd_epi16(a, b); }
    static V packs32(V a, V b) { return _mm256_packs_epi32(a, b); }
    static V packus16(V a, V b) { return _mm256_packus_epi16(a, b); }
    // The two lane-wise packs leave 4-byte groups in the order 0 2 4 6 1 3 5 7.
    static V fixPackOrder(V v) {
        return _mm256_permutevar8x32_epi32(v, _mm256_setr_epi32(0, 4, 1, 5, 2, 6, 3, 7));
    }
    static V interleave(const uint8_t* u, const uint8_t* v) {
        const __m128i uu = _mm_loadu_si128(reinterpret_cast<const __m128i*>(u));
        const __m128i vv = _mm_loadu_si128(reinterpret_cast<const __m128i*>(v));
        return _mm256_set_m128i(_mm_unpackhi_epi8(uu, vv), _mm_unpacklo_epi8(uu, vv));
    }
    // Four byte planes in store order (see toStoreOrder) to 32 pixels.
    template <bool kStream>
    static void store4(uint8_t* p, V b0, V b1, V b2, V b3) {
        const V t0 = _mm256_unpacklo_epi8(b0, b1);
        const V t1 = _mm256_unpackhi_epi8(b0, b1);
        const V t2 = _mm256_unpacklo_epi8(b2, b3);
        const V t3 = _mm256_unpackhi_epi8(b2, b3);
        store<kStream>(p, _mm256_unpacklo_epi16(t0, t2));
        store<kStream>(p + 32, _mm256_unpackhi_epi16(t0, t2));
        store<kStream>(p + 64, _mm256_unpacklo_epi16(t1, t3));
        store<kStream>(p + 96, _mm256_unpackhi_epi16(t1, t3));
    }
};

#include "vc_image_convert_kernels.h"

}  // namespace

bool VCConvert_avx2(const VCImage* source, VCImage* destination) {
    return Kernels<Avx2>::convert(source, destination);
}
#endif
