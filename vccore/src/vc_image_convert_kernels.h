// Vector conversion kernels, written once over a small traits class and
// compiled once per instruction set (vc_image_convert_sse2.cpp,
// vc_image_convert_avx2.cpp). Include only inside an anonymous namespace of
// such a file: the instantiations must not be shared between the two.
//
// Every kernel reproduces the reference loops of vc_image_convert.cpp bit for
// bit. Rows narrower than a vector, and the ends of rows that do not fill
// one, go through the same scalar arithmetic as the reference; only 4:2:0 to
// RGB converts a row's last partial block as a whole block into a buffer.

// Byte positions of R, G, B and alpha in a 4-byte pixel, fixed at compile time
// so that the channel vectors stay in registers.
template <int PR, int PG, int PB, int PA>
struct Order {
    static constexpr int r = PR, g = PG, b = PB, a = PA;
};

// Calls f with the Order of a 4-byte RGB format; false for other formats.
template <class F>
static bool withOrder(uint32_t format, F&& f) {
    switch (format) {
        case VC_FORMAT_RGBA:
            f(Order<0, 1, 2, 3>{});
            return true;
        case VC_FORMAT_BGRA:
            f(Order<2, 1, 0, 3>{});
            return true;
        case VC_FORMAT_ARGB:
            f(Order<1, 2, 3, 0>{});
            return true;
        case VC_FORMAT_ABGR:
            f(Order<3, 2, 1, 0>{});
            return true;
        default:
            return false;
    }
}

template <class T>
struct Kernels {
    using V = typename T::V;
    static constexpr int kBytes = static_cast<int>(sizeof(V));
    // Calls that move at least this much (source and destination together)
    // write with streaming stores: their output would not stay in the last-
    // level cache anyway (32 MB on the 2-core x86 development host), and
    // NV21->RGBA at 12 MP went from 3.0 to 2.6 ms. Below it the output stays
    // cached for whoever reads it next, and ordinary stores win: RGBA->BGRA
    // at 1080p (16.6 MB moved) took 0.29 ms with streaming stores, 1.2x
    // libyuv's ordinary ones, and takes 0.23-0.25 ms (memcpy's time) without.
    static constexpr uint64_t kStreamBytes = 24u << 20;

    // Source bytes kSpan ahead of p into the cache: the hardware prefetcher
    // alone left the RGB to 4:2:0 kernel waiting on its loads (1080p: 0.46
    // against 0.40 ms with it).
    template <int kSpan = kBytes * 4>
    static inline void prefetch(const uint8_t* p) {
        for (int k = 0; k < kSpan; k += 64) __builtin_prefetch(p + 1024 + k);
    }

    // Per-pixel R, G and B offsets of kBytes / 2 chroma pairs, as saturating
    // byte increments and decrements (each pixel of a pair gets the same),
    // in the byte order of toStoreOrder.
    struct Offsets {
        V rPos, rNeg, gPos, gNeg, bPos, bNeg;
    };

    // Word offsets (one per pair) to the two byte vectors; multiplying a
    // byte value by 0x0101 copies it into both bytes of its word. (Packing
    // off with -off and unpacking does the same in as many instructions, but
    // all of them on the shuffle unit the row stores already keep busy:
    // 2-3% slower at 1080p.)
    static inline void splitOffsets(V off, V* pos, V* neg) {
        const V p = T::max16(off, T::zero());
        const V both = T::set1_16(0x0101);
        *pos = T::mullo16(p, both);
        *neg = T::mullo16(T::sub16(p, off), both);
    }

    // c: kBytes interleaved chroma bytes in store order, U first unless kVU.
    // The arithmetic is VCConvert_yuvToRgbFixed's, except for the one chroma
    // pair it corrects (see hasSpecialPair).
    template <bool kVU>
    static inline void pairOffsets(V c, Offsets* out) {
        // Chroma as signed bytes (U - 128, V - 128), and as signed words.
        const V x = T::xor_(c, T::set1_8(0x80));
        const V first = T::srai16(T::slli16(x, 8), 8);
        const V second = T::srai16(x, 8);
        const V u = kVU ? second : first;
        const V v = kVU ? first : second;
        // floor(1.402 v) = v + floor(26346 v / 2^16)
        splitOffsets(T::add16(v, T::mulhi16(v, T::set1_16(26346))), &out->rPos, &out->rNeg);
        // floor(1.772 u) = 2u + floor(-14942 u / 2^16)
        splitOffsets(T::add16(T::add16(u, u), T::mulhi16(u, T::set1_16(-14942))), &out->bPos,
                     &out->bNeg);
        // Green: floor((-360857 u - 748830 v + 16) / 2^20). With
        // N = 360857 u + 748830 v split into base-256 digits of byte-sized
        // factors (360857 = 5:129:153, 748830 = 11:109:30), every partial
        // sum fits a word, and the floor of the whole is taken digit by digit
        // on N + 2^20 - 17 (= 15:255:239), giving -green.
        const V p0 = T::maddubs(kVU ? T::pair8(30, 153) : T::pair8(153, 30), x);
        const V p1 = T::maddubs(kVU ? T::pair8(109, 129) : T::pair8(129, 109), x);
        const V p2 = T::maddubs(kVU ? T::pair8(11, 5) : T::pair8(5, 11), x);
        const V t0 = T::srai16(T::add16(p0, T::set1_16(239)), 8);
        const V t1 = T::srai16(T::add16(T::add16(p1, T::set1_16(255)), t0), 8);
        const V t2 = T::srai16(T::add16(T::add16(p2, T::set1_16(15)), t1), 4);
        splitOffsets(T::sub16(T::zero(), t2), &out->gPos, &out->gNeg);
    }

    // True when c holds the chroma pair (28, 228), whose green the integer
    // model cannot follow for every luma.
    template <bool kVU>
    static inline bool hasSpecialPair(V c) {
        const int u = kVCConvertGFixU, v = kVCConvertGFixV;
        return T::any(T::cmpeq16(c, T::set1_16(kVU ? v | u << 8 : u | v << 8)));
    }

    // One row of kBytes pixels: saturating byte arithmetic is the clamp.
    template <class O, bool kStream>
    static inline void rgbRow(const uint8_t* luma, const Offsets& o, uint8_t* out) {
        const V y = T::toStoreOrder(T::load(luma));
        V ch[4];
        ch[O::r] = T::subsu8(T::addsu8(y, o.rPos), o.rNeg);
        ch[O::g] = T::subsu8(T::addsu8(y, o.gPos), o.gNeg);
        ch[O::b] = T::subsu8(T::addsu8(y, o.bPos), o.bNeg);
        ch[O::a] = T::set1_8(-1);
        T::template store4<kStream>(out, ch[0], ch[1], ch[2], ch[3]);
    }

    template <class O>
    static inline void scalarPixel(int y, int u, int v, uint8_t* px) {
        VCConvert_yuvToRgb(y, u, v, px + O::r, px + O::g, px + O::b);
        px[O::a] = 255;
    }

    // Rows 2 row and 2 row + 1 of a 4:2:0 image, pixels x to x + kBytes, to
    // o0 and o1.
    template <bool kVU, bool kPlanar, class O, bool kStream>
    static inline void yuvBlock(const uint8_t* y0, const uint8_t* y1, const uint8_t* cRow,
                                const uint8_t* uRow, const uint8_t* vRow, int x, uint8_t* o0,
                                uint8_t* o1) {
        const V raw = kPlanar ? T::interleave(uRow + x / 2, vRow + x / 2) : T::load(cRow + x);
        Offsets o;
        pairOffsets<kVU>(T::toStoreOrder(raw), &o);
        rgbRow<O, kStream>(y0 + x, o, o0);
        rgbRow<O, kStream>(y1 + x, o, o1);
        if (hasSpecialPair<kVU>(raw)) {
            // Redo that pair's pixels with the reference arithmetic.
            for (int k = 0; k < kBytes; k += 2) {
                int u, v;
                chromaAt<kVU, kPlanar>(cRow, uRow, vRow, x + k, &u, &v);
                if (u != kVCConvertGFixU || v != kVCConvertGFixV) continue;
                for (int j = 0; j < 2; ++j) {
                    scalarPixel<O>(y0[x + k + j], u, v, o0 + (k + j) * 4);
                    scalarPixel<O>(y1[x + k + j], u, v, o1 + (k + j) * 4);
                }
            }
        }
    }

    // Pixels from..to - 1 of a block that starts at x, through a buffer:
    // the edges of a row, which must not share a store with their
    // neighbours (streaming stores and plain ones should not meet in a line).
    template <bool kVU, bool kPlanar, class O>
    static inline void yuvEdge(const uint8_t* y0, const uint8_t* y1, const uint8_t* cRow,
                               const uint8_t* uRow, const uint8_t* vRow, int x, int from, int to,
                               uint8_t* d0, uint8_t* d1) {
        alignas(64) uint8_t tmp[2][kBytes * 4];
        yuvBlock<kVU, kPlanar, O, false>(y0, y1, cRow, uRow, vRow, x, tmp[0], tmp[1]);
        const size_t bytes = static_cast<size_t>(to - from) * 4;
        memcpy(d0 + static_cast<size_t>(from) * 4, tmp[0] + (from - x) * 4, bytes);
        memcpy(d1 + static_cast<size_t>(from) * 4, tmp[1] + (from - x) * 4, bytes);
    }

    // 4:2:0 to a 4-byte RGB format. uv: interleaved chroma (kPlanar false),
    // or the U and V planes.
    template <bool kVU, bool kPlanar, class O>
    static void yuv420ToRgb32(const uint8_t* luma, const uint8_t* uv, const uint8_t* uPlane,
                              const uint8_t* vPlane, int w, int h, uint8_t* dst, bool stream) {
        const size_t rowBytes = static_cast<size_t>(w) * 4;
        const int half = w / 2;
        // Streaming needs whole 64-byte lines: both rows of a pair must be
        // aligned alike, and an even number of pixels must reach a line.
        const int head = lineHead(dst);
        stream = stream && rowBytes % 64 == 0 && head >= 0 && w >= head + kBytes;
        for (int row = 0; row < h / 2; ++row) {
            const uint8_t* y0 = luma + static_cast<size_t>(2 * row) * w;
            const uint8_t* y1 = y0 + w;
            uint8_t* d0 = dst + static_cast<size_t>(2 * row) * rowBytes;
            uint8_t* d1 = d0 + rowBytes;
            const uint8_t* cRow = kPlanar ? nullptr : uv + static_cast<size_t>(row) * w;
            const uint8_t* uRow = kPlanar ? uPlane + static_cast<size_t>(row) * half : nullptr;
            const uint8_t* vRow = kPlanar ? vPlane + static_cast<size_t>(row) * half : nullptr;
            if (w < kBytes) {
                scalarRows<kVU, kPlanar, O>(y0, y1, cRow, uRow, vRow, 0, w, d0, d1);
                continue;
            }
            int x = 0;
            if (stream) {
                if (head > 0)
                    yuvEdge<kVU, kPlanar, O>(y0, y1, cRow, uRow, vRow, 0, 0, head, d0, d1);
                for (x = head; x + kBytes <= w; x += kBytes)
                    yuvBlock<kVU, kPlanar, O, true>(y0, y1, cRow, uRow, vRow, x,
                                                    d0 + static_cast<size_t>(x) * 4,
                                                    d1 + static_cast<size_t>(x) * 4);
            } else {
                for (; x + kBytes <= w; x += kBytes)
                    yuvBlock<kVU, kPlanar, O, false>(y0, y1, cRow, uRow, vRow, x,
                                                     d0 + static_cast<size_t>(x) * 4,
                                                     d1 + static_cast<size_t>(x) * 4);
            }
            if (x < w) yuvEdge<kVU, kPlanar, O>(y0, y1, cRow, uRow, vRow, w - kBytes, x, w, d0, d1);
        }
        if (stream) T::fence();
    }

    // Pixels (an even number) from d to the next 64-byte line, or -1 when an
    // even number of 4-byte pixels cannot get there.
    static inline int lineHead(const uint8_t* d) {
        const int misaligned = static_cast<int>(reinterpret_cast<uintptr_t>(d) % 64);
        if (misaligned % 8 != 0) return -1;
        return (64 - misaligned) % 64 / 4;
    }

    template <bool kVU, bool kPlanar, class O>
    static void scalarRows(const uint8_t* y0, const uint8_t* y1, const uint8_t* cRow,
                           const uint8_t* uRow, const uint8_t* vRow, int x, int w, uint8_t* d0,
                           uint8_t* d1) {
        for (; x < w; x += 2) {
            int u, v;
            chromaAt<kVU, kPlanar>(cRow, uRow, vRow, x, &u, &v);
            for (int j = 0; j < 2 && x + j < w; ++j) {
                scalarPixel<O>(y0[x + j], u, v, d0 + (x + j) * 4);
                scalarPixel<O>(y1[x + j], u, v, d1 + (x + j) * 4);
            }
        }
    }

    template <bool kVU, bool kPlanar>
    static inline void chromaAt(const uint8_t* cRow, const uint8_t* uRow, const uint8_t* vRow,
                                int x, int* u, int* v) {
        if (kPlanar) {
            *u = uRow[x / 2];
            *v = vRow[x / 2];
        } else {
            *u = cRow[x + (kVU ? 1 : 0)];
            *v = cRow[x + (kVU ? 0 : 1)];
        }
    }

    // Luma of 4-byte pixels as 32-bit sums S = 19595 R + 38470 G + 7471 B:
    // S < 2^24, so its high word is Y and its low word the fraction. rb holds
    // the pixels' (first, second) channel words in chroma order (see
    // rgb32ToYuv420); G enters as the word pair (G, G), since 38470 does not
    // fit a signed 16-bit factor but 19235 does.
    template <class O, int kFirst>
    static inline V lumaSums(V p, V rb) {
        constexpr int kCoefFirst = kFirst == O::r ? 19595 : 7471;
        constexpr int kCoefSecond = kFirst == O::r ? 7471 : 19595;
        return T::add32(T::madd16(rb, T::pair16(kCoefFirst, kCoefSecond)),
                        T::madd16(T::template words<O::g, O::g>(p), T::set1_32(19235 * 0x10001)));
    }

    // kBytes bytes of luma from four vectors of sums, in pixel order.
    static inline V lumaBytes(V s0, V s1, V s2, V s3) {
        const V a = T::packs32(T::srli32(s0, 16), T::srli32(s1, 16));
        const V b = T::packs32(T::srli32(s2, 16), T::srli32(s3, 16));
        return T::fixPackOrder(T::packus16(a, b));
    }

    // Chroma words of the even pixels of two vectors (evenPixels order):
    // (first - Y, second - Y) + 128 through the fixed-point factors, whose
    // values above 32767 are split as x + x * (c - 65536) / 2^16.
    static inline V chromaWords(V rb0, V rb1, V s0, V s1, V factors) {
        const V e =
            T::sub16(T::evenPixels(rb0, rb1), T::template words<2, 2>(T::evenPixels(s0, s1)));
        return T::add16(T::add16(e, T::set1_16(128)), T::mulhi16(e, factors));
    }

    template <class O>
    static inline void scalarRgbToYuv(const uint8_t* px, bool chroma, uint8_t* y, uint8_t* u,
                                      uint8_t* v) {
        const int r = px[O::r], g = px[O::g], b = px[O::b];
        *y = VCConvert_rgbToY(r, g, b);
        if (!chroma) return;
        *u = VCConvert_rgbToU(b, *y);
        *v = VCConvert_rgbToV(r, *y);
    }

    // The tail of a row that does not fill a vector, as the reference does it.
    template <class O, bool kPlanar>
    static void scalarRow(const uint8_t* s, int x, int w, bool chroma, uint8_t* yRow, uint8_t* cRow,
                          bool uFirst, uint8_t* uRow, uint8_t* vRow) {
        for (; x < w; ++x) {
            const bool pairChroma = chroma && x % 2 == 0;
            uint8_t u = 0, v = 0;
            scalarRgbToYuv<O>(s + static_cast<size_t>(x) * 4, pairChroma, yRow + x, &u, &v);
            if (!pairChroma) continue;
            if (kPlanar) {
                uRow[x / 2] = u;
                vRow[x / 2] = v;
            } else {
                cRow[x + (uFirst ? 0 : 1)] = u;
                cRow[x + (uFirst ? 1 : 0)] = v;
            }
        }
    }

    // A 4-byte RGB format to 4:2:0: interleaved chroma (uFirst tells NV12
    // from NV21) or separate U and V planes. Rows go in pairs: the first
    // gives luma and (point-sampled) chroma, the second luma only.
    // kUFirst: the chroma words come out U first (the order rb is built in).
    template <class O, bool kPlanar, bool kUFirst>
    static void rgb32ToYuv420(const uint8_t* src, int w, int h, uint8_t* luma, uint8_t* uv,
                              uint8_t* uPlane, uint8_t* vPlane) {
        // First and second channel of the chroma words: B and R for U, V.
        constexpr int kFirst = kUFirst ? O::b : O::r;
        constexpr int kSecond = kUFirst ? O::r : O::b;
        // (46727 (R - Y)) >> 16 and (36962 (B - Y)) >> 16, split as above.
        const V factors = kUFirst ? T::pair16(36962 - 65536, 46727 - 65536)
                                  : T::pair16(46727 - 65536, 36962 - 65536);
        const int half = w / 2;
        const int q = kBytes / 4;  // pixels per vector
        for (int row = 0; row < h; row += 2) {
            const uint8_t* s = src + static_cast<size_t>(row) * w * 4;
            uint8_t* yRow = luma + static_cast<size_t>(row) * w;
            uint8_t* cRow = kPlanar ? nullptr : uv + static_cast<size_t>(row / 2) * w;
            uint8_t* uRow = kPlanar ? uPlane + static_cast<size_t>(row / 2) * half : nullptr;
            uint8_t* vRow = kPlanar ? vPlane + static_cast<size_t>(row / 2) * half : nullptr;
            int x = 0;
            for (; x + kBytes <= w; x += kBytes) {
                const uint8_t* px = s + static_cast<size_t>(x) * 4;
                prefetch(px);
                const V p0 = T::load(px), p1 = T::load(px + 4 * q);
                const V p2 = T::load(px + 8 * q), p3 = T::load(px + 12 * q);
                const V rb0 = T::template words<kFirst, kSecond>(p0);
                const V rb1 = T::template words<kFirst, kSecond>(p1);
                const V rb2 = T::template words<kFirst, kSecond>(p2);
                const V rb3 = T::template words<kFirst, kSecond>(p3);
                const V s0 = lumaSums<O, kFirst>(p0, rb0), s1 = lumaSums<O, kFirst>(p1, rb1);
                const V s2 = lumaSums<O, kFirst>(p2, rb2), s3 = lumaSums<O, kFirst>(p3, rb3);
                T::store(yRow + x, lumaBytes(s0, s1, s2, s3));
                // Clamping to 0..255 is the unsigned saturation of the pack.
                const V c = T::fixPackOrder(T::packus16(chromaWords(rb0, rb1, s0, s1, factors),
                                                        chromaWords(rb2, rb3, s2, s3, factors)));
                if (kPlanar) {
                    const V low = T::set1_16(0xff);
                    T::storeHalf(kUFirst ? uRow + x / 2 : vRow + x / 2,
                                 T::packus16(T::and_(c, low), T::zero()));
                    T::storeHalf(kUFirst ? vRow + x / 2 : uRow + x / 2,
                                 T::packus16(T::srli16(c, 8), T::zero()));
                } else {
                    T::store(cRow + x, c);
                }
            }
            scalarRow<O, kPlanar>(s, x, w, true, yRow, cRow, kUFirst, uRow, vRow);
            if (row + 1 == h) break;
            s += static_cast<size_t>(w) * 4;
            yRow += w;
            for (x = 0; x + kBytes <= w; x += kBytes) {
                const uint8_t* px = s + static_cast<size_t>(x) * 4;
                prefetch(px);
                const V p0 = T::load(px), p1 = T::load(px + 4 * q);
                const V p2 = T::load(px + 8 * q), p3 = T::load(px + 12 * q);
                T::store(
                    yRow + x,
                    lumaBytes(lumaSums<O, kFirst>(p0, T::template words<kFirst, kSecond>(p0)),
                              lumaSums<O, kFirst>(p1, T::template words<kFirst, kSecond>(p1)),
                              lumaSums<O, kFirst>(p2, T::template words<kFirst, kSecond>(p2)),
                              lumaSums<O, kFirst>(p3, T::template words<kFirst, kSecond>(p3))));
            }
            scalarRow<O, kPlanar>(s, x, w, false, yRow, nullptr, kUFirst, nullptr, nullptr);
        }
    }

    // Between 4-byte RGB formats: out byte k takes in byte from[k].
    static void rgb32ToRgb32(const uint8_t* src, const int from[4], size_t pixels, uint8_t* dst,
                             bool stream) {
        const int f0 = from[0], f1 = from[1], f2 = from[2], f3 = from[3];
        const typename T::Shuffle shuffle = T::makeShuffle(f0, f1, f2, f3);
        auto scalar = [&](size_t i) {
            const uint8_t* s = src + i * 4;
            uint8_t* d = dst + i * 4;
            const uint8_t b0 = s[f0], b1 = s[f1], b2 = s[f2], b3 = s[f3];
            d[0] = b0;
            d[1] = b1;
            d[2] = b2;
            d[3] = b3;
        };
        size_t i = 0;
        const size_t step = static_cast<size_t>(kBytes) / 4;
        if (stream) {
            // Streaming stores from the first 64-byte line on.
            for (; i < pixels && (reinterpret_cast<uintptr_t>(dst + i * 4) & 63) != 0; ++i)
                scalar(i);
            if ((reinterpret_cast<uintptr_t>(dst + i * 4) & 63) == 0) {
                for (; i + 4 * step <= pixels; i += 4 * step) {
                    const V a = T::load(src + i * 4);
                    const V b = T::load(src + (i + step) * 4);
                    const V c = T::load(src + (i + 2 * step) * 4);
                    const V d = T::load(src + (i + 3 * step) * 4);
                    T::template store<true>(dst + i * 4, T::shuffle(a, shuffle));
                    T::template store<true>(dst + (i + step) * 4, T::shuffle(b, shuffle));
                    T::template store<true>(dst + (i + 2 * step) * 4, T::shuffle(c, shuffle));
                    T::template store<true>(dst + (i + 3 * step) * 4, T::shuffle(d, shuffle));
                }
                T::fence();
            }
        }
        // Four vectors a turn keep more loads in flight.
        for (; i + 4 * step <= pixels; i += 4 * step) {
            const V a = T::load(src + i * 4);
            const V b = T::load(src + (i + step) * 4);
            const V c = T::load(src + (i + 2 * step) * 4);
            const V d = T::load(src + (i + 3 * step) * 4);
            T::store(dst + i * 4, T::shuffle(a, shuffle));
            T::store(dst + (i + step) * 4, T::shuffle(b, shuffle));
            T::store(dst + (i + 2 * step) * 4, T::shuffle(c, shuffle));
            T::store(dst + (i + 3 * step) * 4, T::shuffle(d, shuffle));
        }
        for (; i < pixels; ++i) scalar(i);
    }

    static bool rgb32Positions(uint32_t format, int pos[4]) {
        VCRgbLayout l;
        if (!VCImage_rgbLayout(format, &l) || l.bytesPerPixel != 4 || l.a < 0) return false;
        pos[0] = l.r;
        pos[1] = l.g;
        pos[2] = l.b;
        pos[3] = l.a;
        return true;
    }

    static bool convert(const VCImage* src, VCImage* dst) {
        const int w = src->width;
        const int h = src->height;
        const uint64_t moved = static_cast<uint64_t>(VCImage_requiredSize(w, h, src->format)) +
                               VCImage_requiredSize(w, h, dst->format);
        const bool stream = moved >= kStreamBytes;
        int sp[4], dp[4];
        const bool srcRgb32 = rgb32Positions(src->format, sp);
        const bool dstRgb32 = rgb32Positions(dst->format, dp);
        if (srcRgb32 && dstRgb32) {
            int from[4];
            from[dp[0]] = sp[0];
            from[dp[1]] = sp[1];
            from[dp[2]] = sp[2];
            from[dp[3]] = sp[3];
            rgb32ToRgb32(src->data, from, static_cast<size_t>(w) * h, dst->data, stream);
            return true;
        }
        if (VCImage_isYUV420(src->format) && dstRgb32) {
            VCYuvLayout l;
            if (!VCImage_yuvLayout(src, &l)) return false;
            const uint8_t* d = src->data;
            uint8_t* out = dst->data;
            return withOrder(dst->format, [&](auto order) {
                using O = decltype(order);
                switch (src->format) {
                    case VC_FORMAT_NV12:
                        yuv420ToRgb32<false, false, O>(d, d + l.uOffset, nullptr, nullptr, w, h,
                                                       out, stream);
                        break;
                    case VC_FORMAT_NV21:
                        yuv420ToRgb32<true, false, O>(d, d + l.vOffset, nullptr, nullptr, w, h, out,
                                                      stream);
                        break;
                    default:
                        yuv420ToRgb32<false, true, O>(d, nullptr, d + l.uOffset, d + l.vOffset, w,
                                                      h, out, stream);
                        break;
                }
            });
        }
        if (srcRgb32 && VCImage_isYUV420(dst->format)) {
            VCYuvLayout l;
            if (!VCImage_yuvLayout(dst, &l)) return false;
            uint8_t* d = dst->data;
            const uint8_t* in = src->data;
            return withOrder(src->format, [&](auto order) {
                using O = decltype(order);
                switch (dst->format) {
                    case VC_FORMAT_NV12:
                        rgb32ToYuv420<O, false, true>(in, w, h, d, d + l.uOffset, nullptr, nullptr);
                        break;
                    case VC_FORMAT_NV21:
                        rgb32ToYuv420<O, false, false>(in, w, h, d, d + l.vOffset, nullptr,
                                                       nullptr);
                        break;
                    default:
                        rgb32ToYuv420<O, true, true>(in, w, h, d, nullptr, d + l.uOffset,
                                                     d + l.vOffset);
                        break;
                }
            });
        }
        return false;
    }
};
