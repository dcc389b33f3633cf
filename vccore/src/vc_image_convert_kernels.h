// Vector conversion kernels, written once over a small traits class and
// compiled once per instruction set (vc_image_convert_sse2.cpp,
// vc_image_convert_avx2.cpp). Include only inside an anonymous namespace of
// such a file: the instantiations must not be shared between the two.
//
// Every kernel reproduces the reference loops of vc_image_convert.cpp bit for
// bit; columns that do not fill a whole vector go through the same scalar
// arithmetic as the reference.

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
    static constexpr uint32_t kStreamBytes = 32u << 20;

    // Per-pixel R, G and B offsets of kBytes / 2 chroma pairs, as saturating
    // byte increments and decrements (each pixel of a pair gets the same).
    struct Offsets {
        V rPos, rNeg, gPos, gNeg, bPos, bNeg;
        bool special;
    };

    // Word offsets (one per pair) to the two byte vectors; multiplying a
    // byte value by 0x0101 copies it into both bytes of its word.
    static inline void splitOffsets(V off, V* pos, V* neg) {
        const V p = T::max16(off, T::zero());
        const V both = T::set1_16(0x0101);
        *pos = T::mullo16(p, both);
        *neg = T::mullo16(T::sub16(p, off), both);
    }

    // c: kBytes interleaved chroma bytes, U first unless kVU.
    template <bool kVU>
    static inline void pairOffsets(V c, Offsets* out) {
        // Luma and chroma are both taken in the byte order the four-plane
        // store expects (a fixed permutation of 4-pixel groups).
        c = T::toStoreOrder(c);
        const V zero = T::zero();
        const V bias = T::set1_16(128);
        const V low = T::set1_16(0xff);
        const V first = T::sub16(T::and_(c, low), bias);
        const V second = T::sub16(T::srli16(c, 8), bias);
        const V u = kVU ? second : first;
        const V v = kVU ? first : second;
        // floor(1.402 v) = v + floor(26346 v / 2^16)
        const V r = T::add16(v, T::mulhi16(v, T::set1_16(26346)));
        // floor(1.772 u) = 2u + floor(-14942 u / 2^16)
        const V b = T::add16(T::add16(u, u), T::mulhi16(u, T::set1_16(-14942)));
        // Green needs 20 fraction bits: 32-bit multiply-adds over (first,
        // second) word pairs, with the coefficients split as high * 32 + low
        // so that both fit the 16-bit multiplier.
        const int gu = kVCConvertGU;
        const int gv = kVCConvertGV;
        const int guh = gu >> 5, gul = gu - guh * 32;
        const int gvh = gv >> 5, gvl = gv - gvh * 32;
        const V coefGh = kVU ? T::pair16(gvh, guh) : T::pair16(guh, gvh);
        const V coefGl = kVU ? T::pair16(gvl, gul) : T::pair16(gul, gvl);
        const V gBias = T::set1_32(kVCConvertGBias);
        V g[2];
        const V halves[2] = {T::sub16(T::unpacklo8(c, zero), bias),
                             T::sub16(T::unpackhi8(c, zero), bias)};
        for (int i = 0; i < 2; ++i) {
            const V x = halves[i];
            const V gsum = T::add32(T::slli32(T::madd16(x, coefGh), 5), T::madd16(x, coefGl));
            g[i] = T::srai32(T::add32(gsum, gBias), kVCConvertGShift);
        }
        splitOffsets(r, &out->rPos, &out->rNeg);
        splitOffsets(T::packs32(g[0], g[1]), &out->gPos, &out->gNeg);
        splitOffsets(b, &out->bPos, &out->bNeg);
        out->special = T::any(T::and_(T::cmpeq16(u, T::set1_16(kVCConvertGFixU - 128)),
                                      T::cmpeq16(v, T::set1_16(kVCConvertGFixV - 128))));
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

    // 4:2:0 to a 4-byte RGB format. uv: interleaved chroma (planar == false),
    // or the U and V planes.
    template <bool kVU, bool kPlanar, class O>
    static void yuv420ToRgb32(const uint8_t* luma, const uint8_t* uv, const uint8_t* uPlane,
                              const uint8_t* vPlane, int w, int h, uint8_t* dst, bool stream) {
        const bool planar = kPlanar;
        const size_t rowBytes = static_cast<size_t>(w) * 4;
        const int half = w / 2;
        for (int row = 0; row < h / 2; ++row) {
            const uint8_t* y0 = luma + static_cast<size_t>(2 * row) * w;
            const uint8_t* y1 = y0 + w;
            uint8_t* d0 = dst + static_cast<size_t>(2 * row) * rowBytes;
            uint8_t* d1 = d0 + rowBytes;
            const uint8_t* cRow = planar ? nullptr : uv + static_cast<size_t>(row) * w;
            const uint8_t* uRow = planar ? uPlane + static_cast<size_t>(row) * half : nullptr;
            const uint8_t* vRow = planar ? vPlane + static_cast<size_t>(row) * half : nullptr;
            const bool streamRows = stream && T::streamable(d0) && T::streamable(d1);
            int x = 0;
            for (; x + kBytes <= w; x += kBytes) {
                const V c = planar ? T::interleave(uRow + x / 2, vRow + x / 2) : T::load(cRow + x);
                Offsets o;
                pairOffsets<kVU>(c, &o);
                if (streamRows) {
                    rgbRow<O, true>(y0 + x, o, d0 + static_cast<size_t>(x) * 4);
                    rgbRow<O, true>(y1 + x, o, d1 + static_cast<size_t>(x) * 4);
                } else {
                    rgbRow<O, false>(y0 + x, o, d0 + static_cast<size_t>(x) * 4);
                    rgbRow<O, false>(y1 + x, o, d1 + static_cast<size_t>(x) * 4);
                }
                if (o.special) {
                    // The one chroma pair whose green the integer model cannot
                    // follow for every luma: redo its pixels exactly.
                    for (int k = x; k < x + kBytes; k += 2) {
                        int u, v;
                        chromaAt<kVU>(cRow, uRow, vRow, planar, k, &u, &v);
                        if (u != kVCConvertGFixU || v != kVCConvertGFixV) continue;
                        for (int j = 0; j < 2; ++j) {
                            scalarPixel<O>(y0[k + j], u, v, d0 + (k + j) * 4);
                            scalarPixel<O>(y1[k + j], u, v, d1 + (k + j) * 4);
                        }
                    }
                }
            }
            for (; x < w; x += 2) {
                int u, v;
                chromaAt<kVU>(cRow, uRow, vRow, planar, x, &u, &v);
                for (int j = 0; j < 2 && x + j < w; ++j) {
                    scalarPixel<O>(y0[x + j], u, v, d0 + (x + j) * 4);
                    scalarPixel<O>(y1[x + j], u, v, d1 + (x + j) * 4);
                }
            }
        }
        if (stream) T::fence();
    }

    template <bool kVU>
    static inline void chromaAt(const uint8_t* cRow, const uint8_t* uRow, const uint8_t* vRow,
                                bool planar, int x, int* u, int* v) {
        if (planar) {
            *u = uRow[x / 2];
            *v = vRow[x / 2];
        } else {
            *u = cRow[x + (kVU ? 1 : 0)];
            *v = cRow[x + (kVU ? 0 : 1)];
        }
    }

    // (R, B) word pairs of 4-byte pixels: R and B always share a byte parity
    // (and G has the other).
    template <class O>
    static inline V redBlueWords(V p) {
        return T::and_(O::r % 2 == 0 ? p : T::srli16(p, 8), T::set1_16(0xff));
    }

    // Luma (32-bit lanes) of kBytes / 4 pixels of a 4-byte format.
    template <class O>
    static inline V lumaLanes(V p) {
        const V rb = redBlueWords<O>(p);
        const V ga = T::and_(O::g % 2 == 0 ? p : T::srli16(p, 8), T::set1_16(0xff));
        const bool rLow = O::r < 2;
        const bool gLow = O::g < 2;
        // 38470 G = 2 * 19235 G keeps the coefficient within 16 bits.
        const V sum =
            T::add32(T::madd16(rb, rLow ? T::pair16(19595, 7471) : T::pair16(7471, 19595)),
                     T::slli32(T::madd16(ga, gLow ? T::pair16(19235, 0) : T::pair16(0, 19235)), 1));
        return T::srai32(sum, 16);
    }

    // B - Y and R - Y of the even pixels of two pixel vectors, in 32-bit lanes
    // (combineEven order).
    template <class O>
    static inline void chromaDiffs(V p0, V p1, V y0, V y1, V* d, V* e) {
        const V rb = redBlueWords<O>(T::combineEven(p0, p1));
        const V y = T::combineEven(y0, y1);
        const V word = T::set1_32(0xffff);
        const bool rLow = O::r < 2;
        const V r = rLow ? T::and_(rb, word) : T::srli32(rb, 16);
        const V b = rLow ? T::srli32(rb, 16) : T::and_(rb, word);
        *d = T::sub32(b, y);
        *e = T::sub32(r, y);
    }

    // Four vectors of 32-bit lanes to kBytes clamped bytes in pixel order.
    static inline V packBytes(const V q[4]) {
        return T::fixPackOrder(T::packus16(T::packs32(q[0], q[1]), T::packs32(q[2], q[3])));
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

    // A 4-byte RGB format to 4:2:0: interleaved chroma (uFirst tells NV12
    // from NV21) or separate U and V planes.
    template <class O, bool kPlanar>
    static void rgb32ToYuv420(const uint8_t* src, int w, int h, uint8_t* luma, uint8_t* uv,
                              bool uFirst, uint8_t* uPlane, uint8_t* vPlane) {
        const bool planar = kPlanar;
        const int half = w / 2;
        for (int row = 0; row < h; ++row) {
            const uint8_t* s = src + static_cast<size_t>(row) * w * 4;
            uint8_t* yRow = luma + static_cast<size_t>(row) * w;
            const bool chroma = row % 2 == 0;
            uint8_t* cRow = planar ? nullptr : uv + static_cast<size_t>(row / 2) * w;
            uint8_t* uRow = planar ? uPlane + static_cast<size_t>(row / 2) * half : nullptr;
            uint8_t* vRow = planar ? vPlane + static_cast<size_t>(row / 2) * half : nullptr;
            int x = 0;
            for (; x + kBytes <= w; x += kBytes) {
                V ps[4], ys[4];
                for (int i = 0; i < 4; ++i) {
                    ps[i] = T::load(s + (static_cast<size_t>(x) + i * kBytes / 4) * 4);
                    ys[i] = lumaLanes<O>(ps[i]);
                }
                T::store(yRow + x, packBytes(ys));
                if (!chroma) continue;
                // Only even pixels give chroma: their lanes of two vectors are
                // packed into one, and two of those into 16-bit words.
                V d[2], e[2];
                chromaDiffs<O>(ps[0], ps[1], ys[0], ys[1], &d[0], &e[0]);
                chromaDiffs<O>(ps[2], ps[3], ys[2], ys[3], &d[1], &e[1]);
                const V d16 = T::packs32(d[0], d[1]);
                const V e16 = T::packs32(e[0], e[1]);
                const V bias = T::set1_16(128);
                // (36962 d) >> 16 is the high half of 2d * 18481.
                const V u = T::add16(T::mulhi16(T::add16(d16, d16), T::set1_16(18481)), bias);
                // (46727 e) >> 16 = e + the high half of e * -18809.
                const V v = T::add16(T::add16(e16, T::mulhi16(e16, T::set1_16(-18809))), bias);
                const V zero = T::zero();
                const V low = T::set1_16(0xff);
                const V u16 = T::min16(T::max16(u, zero), low);
                const V v16 = T::min16(T::max16(v, zero), low);
                const bool uLow = planar || uFirst;
                const V pairs =
                    T::pairOrder(T::or_(uLow ? u16 : v16, T::slli16(uLow ? v16 : u16, 8)));
                if (planar) {
                    T::storeHalf(uRow + x / 2, T::packus16(T::and_(pairs, low), zero));
                    T::storeHalf(vRow + x / 2, T::packus16(T::srli16(pairs, 8), zero));
                } else {
                    T::store(cRow + x, pairs);
                }
            }
            for (; x < w; ++x) {
                const bool pairChroma = chroma && x % 2 == 0;
                uint8_t u = 0, v = 0;
                scalarRgbToYuv<O>(s + static_cast<size_t>(x) * 4, pairChroma, yRow + x, &u, &v);
                if (!pairChroma) continue;
                if (planar) {
                    uRow[x / 2] = u;
                    vRow[x / 2] = v;
                } else {
                    cRow[x + (uFirst ? 0 : 1)] = u;
                    cRow[x + (uFirst ? 1 : 0)] = v;
                }
            }
        }
    }

    // Between 4-byte RGB formats: out byte k takes in byte from[k].
    static void rgb32ToRgb32(const uint8_t* src, const int from[4], size_t pixels, uint8_t* dst,
                             bool stream) {
        const int f0 = from[0], f1 = from[1], f2 = from[2], f3 = from[3];
        const typename T::Shuffle shuffle = T::makeShuffle(f0, f1, f2, f3);
        size_t i = 0;
        const size_t step = static_cast<size_t>(kBytes) / 4;
        if (stream) {
            // Write-combining stores once the destination is aligned.
            for (; i < pixels && !T::streamable(dst + i * 4); ++i)
                for (int k = 0; k < 4; ++k) dst[i * 4 + k] = src[i * 4 + from[k]];
            for (; i + step <= pixels; i += step)
                T::template store<true>(dst + i * 4, T::shuffle(T::load(src + i * 4), shuffle));
            T::fence();
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
        for (; i + step <= pixels; i += step)
            T::store(dst + i * 4, T::shuffle(T::load(src + i * 4), shuffle));
        for (; i < pixels; ++i) {
            const uint8_t* s = src + i * 4;
            uint8_t* d = dst + i * 4;
            const uint8_t b0 = s[f0], b1 = s[f1], b2 = s[f2], b3 = s[f3];
            d[0] = b0;
            d[1] = b1;
            d[2] = b2;
            d[3] = b3;
        }
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
        // Outputs far beyond any cache bypass it rather than evict everything.
        const bool stream = VCImage_requiredSize(w, h, dst->format) >= kStreamBytes;
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
                        rgb32ToYuv420<O, false>(in, w, h, d, d + l.uOffset, true, nullptr, nullptr);
                        break;
                    case VC_FORMAT_NV21:
                        rgb32ToYuv420<O, false>(in, w, h, d, d + l.vOffset, false, nullptr,
                                                nullptr);
                        break;
                    default:
                        rgb32ToYuv420<O, true>(in, w, h, d, nullptr, false, d + l.uOffset,
                                               d + l.vOffset);
                        break;
                }
            });
        }
        return false;
    }
};
