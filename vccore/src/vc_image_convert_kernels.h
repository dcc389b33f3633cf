// Vector conversion kernels, written once over a small traits class and
// compiled once per instruction set (vc_image_convert_sse2.cpp,
// vc_image_convert_avx2.cpp). Include only inside an anonymous namespace of
// such a file: the instantiations must not be shared between the two.
//
// Every kernel reproduces the reference loops of vc_image_convert.cpp bit for
// bit; columns that do not fill a whole vector go through the same scalar
// arithmetic as the reference.

template <class T>
struct Kernels {
    using V = typename T::V;
    static constexpr int kBytes = static_cast<int>(sizeof(V));

    // Splits interleaved chroma (kBytes / 2 pairs, 16-bit words as lanes of
    // 32-bit pairs) into per-pair R, G and B offsets.
    struct Offsets {
        V r, g, b;
        bool special;
    };

    template <bool kVU>
    static inline V chromaWords(V x, bool high) {
        // The 16-bit half holding U (or V) of every 32-bit pair lane.
        return high ? T::srai32(x, 16) : T::srai32(T::slli32(x, 16), 16);
    }

    template <bool kVU>
    static inline void pairOffsets(V c, Offsets* out) {
        const V zero = T::zero();
        const V bias = T::set1_16(128);
        const V lo = T::sub16(T::unpacklo8(c, zero), bias);
        const V hi = T::sub16(T::unpackhi8(c, zero), bias);
        // Word 0 of each pair holds the first chroma byte: U for NV12, V for NV21.
        const int vHi = kVU ? 0 : 1;
        const V coefR = kVU ? T::pair16(26346, 0) : T::pair16(0, 26346);
        const V coefB = kVU ? T::pair16(0, -14942) : T::pair16(-14942, 0);
        const int gu = kVCConvertGU;
        const int gv = kVCConvertGV;
        // Green coefficients split as high * 32 + low, both small enough for
        // the 16-bit multiply-add.
        const int guh = gu >> 5, gul = gu - guh * 32;
        const int gvh = gv >> 5, gvl = gv - gvh * 32;
        const V coefGh = kVU ? T::pair16(gvh, guh) : T::pair16(guh, gvh);
        const V coefGl = kVU ? T::pair16(gvl, gul) : T::pair16(gul, gvl);
        const V gBias = T::set1_32(kVCConvertGBias);
        const uint32_t su = static_cast<uint16_t>(kVCConvertGFixU - 128);
        const uint32_t sv = static_cast<uint16_t>(kVCConvertGFixV - 128);
        const V special = T::set1_32(static_cast<int>(kVU ? (sv | su << 16) : (su | sv << 16)));
        V r[2], g[2], b[2];
        const V halves[2] = {lo, hi};
        bool any = false;
        for (int i = 0; i < 2; ++i) {
            const V x = halves[i];
            const V v = chromaWords<kVU>(x, vHi == 1);
            const V u = chromaWords<kVU>(x, vHi == 0);
            // floor(1.402 v) = v + floor(26346 v / 2^16)
            r[i] = T::add32(v, T::srai32(T::madd16(x, coefR), 16));
            // floor(1.772 u) = 2u + floor(-14942 u / 2^16)
            b[i] = T::add32(T::add32(u, u), T::srai32(T::madd16(x, coefB), 16));
            const V gsum = T::add32(T::slli32(T::madd16(x, coefGh), 5), T::madd16(x, coefGl));
            g[i] = T::srai32(T::add32(gsum, gBias), kVCConvertGShift);
            any = any || T::anyEq32(x, special);
        }
        out->r = T::packs32(r[0], r[1]);
        out->g = T::packs32(g[0], g[1]);
        out->b = T::packs32(b[0], b[1]);
        out->special = any;
    }

    static inline V addOffsets(V ylo, V yhi, V off) {
        return T::packus16(T::add16(ylo, T::unpacklo16(off, off)),
                           T::add16(yhi, T::unpackhi16(off, off)));
    }

    // One row of kBytes pixels from kBytes luma bytes and the pair offsets.
    static inline void rgbRow(const uint8_t* luma, const Offsets& o, const int pos[4],
                              uint8_t* out) {
        const V zero = T::zero();
        const V y = T::load(luma);
        const V ylo = T::unpacklo8(y, zero);
        const V yhi = T::unpackhi8(y, zero);
        V ch[4];
        ch[pos[0]] = addOffsets(ylo, yhi, o.r);
        ch[pos[1]] = addOffsets(ylo, yhi, o.g);
        ch[pos[2]] = addOffsets(ylo, yhi, o.b);
        ch[pos[3]] = T::set1_8(-1);
        T::store4(out, ch[0], ch[1], ch[2], ch[3]);
    }

    static inline void scalarPixel(int y, int u, int v, const int pos[4], uint8_t* px) {
        VCConvert_yuvToRgb(y, u, v, px + pos[0], px + pos[1], px + pos[2]);
        px[pos[3]] = 255;
    }

    // 4:2:0 to a 4-byte RGB format. uv: interleaved chroma (planar == false),
    // or the U and V planes.
    template <bool kVU>
    static void yuv420ToRgb32(const uint8_t* luma, const uint8_t* uv, const uint8_t* uPlane,
                              const uint8_t* vPlane, bool planar, int w, int h, const int pos[4],
                              uint8_t* dst) {
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
            int x = 0;
            for (; x + kBytes <= w; x += kBytes) {
                const V c = planar ? T::interleave(uRow + x / 2, vRow + x / 2) : T::load(cRow + x);
                Offsets o;
                pairOffsets<kVU>(c, &o);
                rgbRow(y0 + x, o, pos, d0 + static_cast<size_t>(x) * 4);
                rgbRow(y1 + x, o, pos, d1 + static_cast<size_t>(x) * 4);
                if (o.special) {
                    // The one chroma pair whose green the integer model cannot
                    // follow for every luma: redo its pixels exactly.
                    for (int k = x; k < x + kBytes; k += 2) {
                        int u, v;
                        chromaAt<kVU>(cRow, uRow, vRow, planar, k, &u, &v);
                        if (u != kVCConvertGFixU || v != kVCConvertGFixV) continue;
                        for (int j = 0; j < 2; ++j) {
                            scalarPixel(y0[k + j], u, v, pos, d0 + (k + j) * 4);
                            scalarPixel(y1[k + j], u, v, pos, d1 + (k + j) * 4);
                        }
                    }
                }
            }
            for (; x < w; x += 2) {
                int u, v;
                chromaAt<kVU>(cRow, uRow, vRow, planar, x, &u, &v);
                for (int j = 0; j < 2 && x + j < w; ++j) {
                    scalarPixel(y0[x + j], u, v, pos, d0 + (x + j) * 4);
                    scalarPixel(y1[x + j], u, v, pos, d1 + (x + j) * 4);
                }
            }
        }
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

    // Luma, U and V (32-bit lanes) of kBytes / 4 pixels of a 4-byte format.
    static inline void rgbToYuvLanes(V p, const int pos[4], bool chroma, V* y, V* u, V* v) {
        const V ff = T::set1_32(0xff);
        const V r = T::and_(T::srl32(p, 8 * pos[0]), ff);
        const V g = T::and_(T::srl32(p, 8 * pos[1]), ff);
        const V b = T::and_(T::srl32(p, 8 * pos[2]), ff);
        const V low = T::set1_32(0xffff);
        // (19595 R + 38470 G + 7471 B) >> 16 = G + ((19595 (R-G) + 7471 (B-G)) >> 16)
        const V rg = T::sub32(r, g);
        const V bg = T::sub32(b, g);
        const V x = T::or_(T::and_(rg, low), T::slli32(bg, 16));
        *y = T::add32(g, T::srai32(T::madd16(x, T::pair16(19595, 7471)), 16));
        if (!chroma) return;
        const V bias = T::set1_32(128);
        const V db = T::sub32(b, *y);
        const V dr = T::sub32(r, *y);
        // 36962 = 18481 + 18481 and 46727 = 23364 + 23363 keep the products exact.
        const V xb = T::or_(T::and_(db, low), T::slli32(db, 16));
        const V xr = T::or_(T::and_(dr, low), T::slli32(dr, 16));
        *u = T::add32(T::srai32(T::madd16(xb, T::pair16(18481, 18481)), 16), bias);
        *v = T::add32(T::srai32(T::madd16(xr, T::pair16(23364, 23363)), 16), bias);
    }

    // Four vectors of 32-bit lanes to kBytes clamped bytes in pixel order.
    static inline V packBytes(const V q[4]) {
        return T::fixPackOrder(T::packus16(T::packs32(q[0], q[1]), T::packs32(q[2], q[3])));
    }

    static inline void scalarRgbToYuv(const uint8_t* px, const int pos[4], bool chroma,
                                      uint8_t* y, uint8_t* u, uint8_t* v) {
        const int r = px[pos[0]], g = px[pos[1]], b = px[pos[2]];
        *y = VCConvert_rgbToY(r, g, b);
        if (!chroma) return;
        *u = VCConvert_rgbToU(b, *y);
        *v = VCConvert_rgbToV(r, *y);
    }

    // A 4-byte RGB format to 4:2:0: interleaved chroma (uFirst tells NV12
    // from NV21) or separate U and V planes.
    static void rgb32ToYuv420(const uint8_t* src, const int pos[4], int w, int h, uint8_t* luma,
                              uint8_t* uv, bool uFirst, uint8_t* uPlane, uint8_t* vPlane,
                              bool planar) {
        const V mask = T::set1_16(0xff);
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
                V ys[4] = {}, us[4] = {}, vs[4] = {};
                for (int i = 0; i < 4; ++i)
                    rgbToYuvLanes(T::load(s + (static_cast<size_t>(x) + i * kBytes / 4) * 4), pos,
                                  chroma, &ys[i], &us[i], &vs[i]);
                T::store(yRow + x, packBytes(ys));
                if (!chroma) continue;
                // Even pixels carry the chroma of their pair.
                const V ub = T::and_(packBytes(us), mask);
                const V vb = T::and_(packBytes(vs), mask);
                if (planar) {
                    T::storeHalf(uRow + x / 2, T::packus16(ub, T::zero()));
                    T::storeHalf(vRow + x / 2, T::packus16(vb, T::zero()));
                } else {
                    const V first = uFirst ? ub : vb;
                    const V second = uFirst ? vb : ub;
                    T::store(cRow + x, T::or_(first, T::slli16(second, 8)));
                }
            }
            for (; x < w; ++x) {
                const bool pairChroma = chroma && x % 2 == 0;
                uint8_t u = 0, v = 0;
                scalarRgbToYuv(s + static_cast<size_t>(x) * 4, pos, pairChroma, yRow + x, &u, &v);
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

    // Between 4-byte RGB formats: out byte i takes in byte from[i].
    static void rgb32ToRgb32(const uint8_t* src, const int from[4], size_t pixels,
                             uint8_t* dst) {
        const V ff = T::set1_32(0xff);
        size_t i = 0;
        const size_t step = static_cast<size_t>(kBytes) / 4;
        for (; i + step <= pixels; i += step) {
            const V p = T::load(src + i * 4);
            V out = T::zero();
            for (int k = 0; k < 4; ++k)
                out = T::or_(out, T::sll32(T::and_(T::srl32(p, 8 * from[k]), ff), 8 * k));
            T::store(dst + i * 4, out);
        }
        for (; i < pixels; ++i)
            for (int k = 0; k < 4; ++k) dst[i * 4 + k] = src[i * 4 + from[k]];
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
        int sp[4], dp[4];
        const bool srcRgb32 = rgb32Positions(src->format, sp);
        const bool dstRgb32 = rgb32Positions(dst->format, dp);
        if (srcRgb32 && dstRgb32) {
            int from[4];
            from[dp[0]] = sp[0];
            from[dp[1]] = sp[1];
            from[dp[2]] = sp[2];
            from[dp[3]] = sp[3];
            rgb32ToRgb32(src->data, from, static_cast<size_t>(w) * h, dst->data);
            return true;
        }
        if (VCImage_isYUV420(src->format) && dstRgb32) {
            VCYuvLayout l;
            if (!VCImage_yuvLayout(src, &l)) return false;
            const uint8_t* d = src->data;
            switch (src->format) {
                case VC_FORMAT_NV12:
                    yuv420ToRgb32<false>(d, d + l.uOffset, nullptr, nullptr, false, w, h, dp,
                                         dst->data);
                    return true;
                case VC_FORMAT_NV21:
                    yuv420ToRgb32<true>(d, d + l.vOffset, nullptr, nullptr, false, w, h, dp,
                                        dst->data);
                    return true;
                default:
                    yuv420ToRgb32<false>(d, nullptr, d + l.uOffset, d + l.vOffset, true, w, h, dp,
                                         dst->data);
                    return true;
            }
        }
        if (srcRgb32 && VCImage_isYUV420(dst->format)) {
            VCYuvLayout l;
            if (!VCImage_yuvLayout(dst, &l)) return false;
            uint8_t* d = dst->data;
            switch (dst->format) {
                case VC_FORMAT_NV12:
                    rgb32ToYuv420(src->data, sp, w, h, d, d + l.uOffset, true, nullptr, nullptr,
                                  false);
                    return true;
                case VC_FORMAT_NV21:
                    rgb32ToYuv420(src->data, sp, w, h, d, d + l.vOffset, false, nullptr, nullptr,
                                  false);
                    return true;
                default:
                    rgb32ToYuv420(src->data, sp, w, h, d, nullptr, false, d + l.uOffset,
                                  d + l.vOffset, true);
                    return true;
            }
        }
        return false;
    }
};
