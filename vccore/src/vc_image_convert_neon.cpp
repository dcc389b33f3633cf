// NEON instantiation of the vector conversion kernels. NEON is part of the
// arm64 baseline, so this path needs no run-time check.
#if defined(__aarch64__)
#include <arm_neon.h>
#include <stddef.h>
#include <string.h>

#include "vc_image_convert_fast.h"
#include "vc_image_layout.h"

namespace {

// The kernels treat a vector as untyped bits (like an SSE register); every
// operation reinterprets it as the lane type it works on.
struct Neon {
    using V = uint8x16_t;

    static int16x8_t s16(V v) { return vreinterpretq_s16_u8(v); }
    static uint16x8_t u16(V v) { return vreinterpretq_u16_u8(v); }
    static int32x4_t s32(V v) { return vreinterpretq_s32_u8(v); }
    static uint32x4_t u32(V v) { return vreinterpretq_u32_u8(v); }
    static V b(int16x8_t v) { return vreinterpretq_u8_s16(v); }
    static V b(uint16x8_t v) { return vreinterpretq_u8_u16(v); }
    static V b(int32x4_t v) { return vreinterpretq_u8_s32(v); }
    static V b(uint32x4_t v) { return vreinterpretq_u8_u32(v); }

    static V zero() { return vdupq_n_u8(0); }
    static V load(const uint8_t* p) { return vld1q_u8(p); }
    // No cache-bypassing store worth having here: the streaming variant is a
    // plain store.
    template <bool kStream = false>
    static void store(uint8_t* p, V v) {
        vst1q_u8(p, v);
    }
    static void fence() {}
    static void storeHalf(uint8_t* p, V v) { vst1_u8(p, vget_low_u8(v)); }
    static V set1_8(int v) { return vdupq_n_u8(static_cast<uint8_t>(v)); }
    static V pair8(int lo, int hi) { return b(vdupq_n_u16(static_cast<uint16_t>(hi << 8 | lo))); }
    static V set1_16(int v) { return b(vdupq_n_s16(static_cast<int16_t>(v))); }
    static V set1_32(int v) { return b(vdupq_n_s32(v)); }
    static V pair16(int lo, int hi) {
        return b(vdupq_n_u32((static_cast<uint32_t>(hi) << 16) | static_cast<uint16_t>(lo)));
    }
    static V add16(V a, V c) { return b(vaddq_s16(s16(a), s16(c))); }
    static V max16(V a, V c) { return b(vmaxq_s16(s16(a), s16(c))); }
    static V mullo16(V a, V c) { return b(vmulq_s16(s16(a), s16(c))); }
    static V sub16(V a, V c) { return b(vsubq_s16(s16(a), s16(c))); }
    static V add32(V a, V c) { return b(vaddq_s32(s32(a), s32(c))); }
    static V and_(V a, V c) { return vandq_u8(a, c); }
    static V xor_(V a, V c) { return veorq_u8(a, c); }
    // Unsigned bytes of a times signed bytes of c, adjacent products summed
    // into words (x86's pmaddubsw; the kernels' sums always fit a word).
    static V maddubs(V a, V c) {
        const int16x8_t lo = vmulq_s16(vreinterpretq_s16_u16(vmovl_u8(vget_low_u8(a))),
                                       vmovl_s8(vget_low_s8(vreinterpretq_s8_u8(c))));
        const int16x8_t hi = vmulq_s16(vreinterpretq_s16_u16(vmovl_high_u8(a)),
                                       vmovl_high_s8(vreinterpretq_s8_u8(c)));
        return b(vpaddq_s16(lo, hi));
    }
    // Shift counts come in as variables: register shifts (negative = right).
    static V slli16(V a, int n) {
        return b(vshlq_u16(u16(a), vdupq_n_s16(static_cast<int16_t>(n))));
    }
    static V srli32(V a, int n) { return b(vshlq_u32(u32(a), vdupq_n_s32(-n))); }
    static V srai16(V a, int n) {
        return b(vshlq_s16(s16(a), vdupq_n_s16(static_cast<int16_t>(-n))));
    }
    static V srli16(V a, int n) {
        return b(vshlq_u16(u16(a), vdupq_n_s16(static_cast<int16_t>(-n))));
    }
    // Byte moves inside every 4-byte pixel: one table lookup.
    using Shuffle = uint8x16_t;
    static Shuffle makeShuffle(int f0, int f1, int f2, int f3) {
        const int from[4] = {f0, f1, f2, f3};
        uint8_t index[16];
        for (int i = 0; i < 16; ++i) index[i] = static_cast<uint8_t>(i / 4 * 4 + from[i % 4]);
        return vld1q_u8(index);
    }
    static V shuffle(V p, const Shuffle& s) { return vqtbl1q_u8(p, s); }
    // Dwords 0 and 2 of a, then those of c.
    static V evenPixels(V a, V c) { return b(vuzp1q_u32(u32(a), u32(c))); }
    // Bytes I and J of every 4-byte group as its two words (out-of-range
    // table indices read as zero).
    template <int I, int J>
    static V words(V p) {
        static const uint8_t kIndex[16] = {I,     255, J,     255, I + 4,  255, J + 4,  255,
                                           I + 8, 255, J + 8, 255, I + 12, 255, J + 12, 255};
        return vqtbl1q_u8(p, vld1q_u8(kIndex));
    }
    // High halves of the signed 32-bit products.
    static V mulhi16(V a, V c) {
        const int32x4_t lo = vmull_s16(vget_low_s16(s16(a)), vget_low_s16(s16(c)));
        const int32x4_t hi = vmull_high_s16(s16(a), s16(c));
        return b(vuzp2q_s16(vreinterpretq_s16_s32(lo), vreinterpretq_s16_s32(hi)));
    }
    static V addsu8(V a, V c) { return vqaddq_u8(a, c); }
    static V subsu8(V a, V c) { return vqsubq_u8(a, c); }
    static V cmpeq16(V a, V c) { return b(vceqq_u16(u16(a), u16(c))); }
    static bool any(V a) { return vmaxvq_u8(a) != 0; }
    static V toStoreOrder(V v) { return v; }
    // Sums of adjacent signed word products, as 32-bit lanes.
    static V madd16(V a, V c) {
        const int32x4_t lo = vmull_s16(vget_low_s16(s16(a)), vget_low_s16(s16(c)));
        const int32x4_t hi = vmull_high_s16(s16(a), s16(c));
        return b(vpaddq_s32(lo, hi));
    }
    static V packs32(V a, V c) { return b(vcombine_s16(vqmovn_s32(s32(a)), vqmovn_s32(s32(c)))); }
    static V packus16(V a, V c) { return vcombine_u8(vqmovun_s16(s16(a)), vqmovun_s16(s16(c))); }
    static V fixPackOrder(V v) { return v; }
    // kBytes / 2 U bytes and as many V bytes, interleaved U, V, U, V …
    static V interleave(const uint8_t* u, const uint8_t* v) {
        const uint8x8x2_t z = vzip_u8(vld1_u8(u), vld1_u8(v));
        return vcombine_u8(z.val[0], z.val[1]);
    }
    // Four byte planes (byte 0 … byte 3 of every pixel) to 16 pixels.
    template <bool kStream>
    static void store4(uint8_t* p, V b0, V b1, V b2, V b3) {
        uint8x16x4_t planes;
        planes.val[0] = b0;
        planes.val[1] = b1;
        planes.val[2] = b2;
        planes.val[3] = b3;
        vst4q_u8(p, planes);
    }
};

#include "vc_image_convert_kernels.h"

}  // namespace

bool VCConvert_neon(const VCImage* source, VCImage* destination) {
    return Kernels<Neon>::convert(source, destination);
}
#endif
