// The geometric looks and Beauty restated on the CPU: sample positions and
// blur taps computed again from their formulas, in float, with GL's sampling
// rules (texel centres, GL_LINEAR, clamp to edge).
#include <algorithm>
#include <cmath>
#include <cstdlib>

#include <gtest/gtest.h>

#include "support/look_reference.h"

namespace lookref {

namespace {

float clamp01(float v) {
    return std::min(std::max(v, 0.0f), 1.0f);
}

uint8_t to8(float v) {
    return static_cast<uint8_t>(std::lround(clamp01(v) * 255.0f));
}

Expectation blank(int width, int height) {
    Expectation e;
    e.width = width;
    e.height = height;
    e.lo.assign(size_t(width) * height * 4, 0);
    e.hi.assign(size_t(width) * height * 4, 0);
    e.skip.assign(size_t(width) * height, false);
    return e;
}

// The colours within `slack` (texture units, either axis) of (s, t).
struct Range {
    float lo[4], hi[4];
    void set(const float c[4]) {
        std::copy(c, c + 4, lo);
        std::copy(c, c + 4, hi);
    }
    void add(const float c[4]) {
        for (int k = 0; k < 4; ++k) {
            lo[k] = std::min(lo[k], c[k]);
            hi[k] = std::max(hi[k], c[k]);
        }
    }
};

Range sampleRange(const Picture& p, float s, float t, float slack) {
    Range r;
    float c[4];
    p.sample(s, t, c);
    r.set(c);
    for (int dy = -1; dy <= 1; ++dy) {
        for (int dx = -1; dx <= 1; ++dx) {
            if (slack == 0.0f || (dx == 0 && dy == 0)) continue;
            p.sample(s + dx * slack, t + dy * slack, c);
            r.add(c);
        }
    }
    return r;
}

void store(Expectation& e, size_t i, const Range& r) {
    for (int k = 0; k < 4; ++k) {
        e.lo[i * 4 + k] = to8(r.lo[k]);
        e.hi[i * 4 + k] = to8(r.hi[k]);
    }
}

void storeColour(Expectation& e, size_t i, const float c[4]) {
    Range r;
    r.set(c);
    store(e, i, r);
}

// The lopsided 3x3 relief: -8 on the neighbour below, +1 on the pixel.
bool embossed(const Picture& p, float s, float t, float out[4]) {
    const float sx = 1.0f / p.width(), sy = 1.0f / p.height();
    const float at[9][2] = {{s - sx, t - sy}, {s - sx, t}, {s - sx, t + sx},
                            {s, t - sy},      {s, t + sy}, {s, t},
                            {s + sx, t - sy}, {s + sx, t}, {s + sx, t + sy}};
    float n[9][4];
    for (int i = 0; i < 9; ++i) p.sample(at[i][0], at[i][1], n[i]);
    float edge[3];
    for (int k = 0; k < 3; ++k) {
        float sum = 0;
        for (int i : {0, 1, 2, 3, 5, 6, 7, 8}) sum += n[i][k];
        edge[k] = 1.0f - (sum - 8.0f * n[4][k]);
    }
    float m = std::max(std::max(edge[0], edge[1]), edge[2]);
    bool near = std::fabs(m - 0.2f) < 0.02f;
    if (m <= 0.2f) m = 0.3f;
    m = m * m;
    float f = 1.0f / (1.0f + 0.25f / m) + 0.1f;
    out[0] = out[1] = out[2] = f;
    out[3] = 1.0f;
    return near;
}

}  // namespace

void expectWithin(const Expectation& e, const uint8_t* actual, int tolerance,
                  const std::string& label, double maxSkipped) {
    const size_t n = size_t(e.width) * e.height;
    size_t bad = 0, skipped = 0;
    std::string first;
    for (size_t i = 0; i < n; ++i) {
        if (e.skip[i]) {
            ++skipped;
            continue;
        }
        for (int ch = 0; ch < 4; ++ch) {
            int got = actual[i * 4 + ch];
            if (got >= e.lo[i * 4 + ch] - tolerance && got <= e.hi[i * 4 + ch] + tolerance)
                continue;
            if (bad++ == 0)
                first = std::to_string(i % e.width) + "," + std::to_string(i / e.width) + " ch" +
                        std::to_string(ch) + " want " + std::to_string(e.lo[i * 4 + ch]) + ".." +
                        std::to_string(e.hi[i * 4 + ch]) + " got " + std::to_string(got);
            break;
        }
    }
    EXPECT_EQ(0u, bad) << label << ": first bad pixel " << first;
    EXPECT_LE(double(skipped), maxSkipped * n) << label << ": too many pixels skipped";
}

Expectation renderGeometric(int id, const Picture& p, float time, float level,
                            float positionSlack) {
    const int w = p.width(), h = p.height();
    Expectation e = blank(w, h);
    const float aspect = float(h) / float(w);
    const float lo = 0.075f * level, hi = 1.0f - lo;
    const float ratio = float(w) / float(h);
    const float distortion = ratio > 1.7f ? level : level * 1.2238373f;
    for (int y = 0; y < h; ++y) {
        for (int x = 0; x < w; ++x) {
            const size_t i = size_t(y) * w + x;
            const float s = (x + 0.5f) / w, t = (y + 0.5f) / h;
            float ss = s, tt = t;
            float scale = 1.0f;
            bool opaque = false;
            switch (id) {
                case 445: {  // cells of 32 camera pixels, same texture step both ways
                    const float step = 32.0f / w;
                    ss = step * std::floor(s / step);
                    tt = step * std::floor(t / step);
                    break;
                }
                case 444: {  // waves from the centre at the given time
                    float cs = s * 0.96f + 0.02f, ct = t * 0.96f + 0.02f;
                    float px = -1.0f + 2.0f * cs, py = -1.0f + 2.0f * ct;
                    float len = std::sqrt(px * px + py * py);
                    if (len < 1e-3f) e.skip[i] = true;  // the direction is undefined
                    float wave = std::cos(len * 12.0f - time * 4.0f) * 0.02f;
                    ss = cs + px / len * wave;
                    tt = ct + py / len * wave;
                    break;
                }
                case 441: {
                    float c[4];
                    e.skip[i] = embossed(p, s, t, c);
                    storeColour(e, i, c);
                    continue;
                }
                case 417: {  // lens over a centred square, black outside its circle
                    float mx = (s - (1.0f - aspect) / 2.0f) / aspect, my = t;
                    float nx = mx - 0.5f, ny = my - 0.5f;
                    float dist = std::sqrt(nx * nx + ny * ny) + 0.0001f;
                    if (dist >= 1.0f) {  // sqrt of a negative on the GPU: undefined
                        e.skip[i] = true;
                        continue;
                    }
                    float dist1 = dist + 4.5f * (1.0f - std::sqrt(1.0f - dist * dist));
                    ss = (dist1 * nx / dist) * 0.45f + 0.5f;
                    tt = (dist1 * ny / dist) * 0.45f + 0.5f;
                    ss = ss * aspect + (1.0f - aspect) / 2.0f;
                    float qx = 0.5f * (s - 0.5f) / aspect, qy = 0.5f * (t - 0.5f);
                    float d2 = std::sqrt(qx * qx + qy * qy);
                    if (std::fabs(d2 - 0.25f) < 0.002f) e.skip[i] = true;
                    scale = d2 <= 0.25f ? 1.0f : 0.0f;
                    break;
                }
                case 447: {  // the zoomed coordinates pushed out from the centre
                    float vx = lo + (hi - lo) * s, vy = lo + (hi - lo) * t;
                    ss = vx;
                    tt = vy;
                    if (distortion != 0.0f) {
                        float wx = (vx - 0.5f) * ratio, wy = vy - 0.5f;
                        float radius = std::sqrt(wx * wx + wy * wy) * distortion;
                        if (radius < 1e-4f) e.skip[i] = true;
                        float theta = std::atan(radius) / radius;
                        ss = 0.5f + (2.0f - theta) * (vx - 0.5f);
                        tt = 0.5f + (2.0f - theta) * (vy - 0.5f);
                    }
                    opaque = true;
                    break;
                }
                default:
                    e.skip[i] = true;
                    continue;
            }
            Range r = sampleRange(p, ss, tt, positionSlack);
            for (int k = 0; k < 3; ++k) {
                r.lo[k] *= scale;
                r.hi[k] *= scale;
            }
            if (opaque) r.lo[3] = r.hi[3] = 1.0f;
            store(e, i, r);
        }
    }
    return e;
}

Expectation renderBeauty(const Picture& p, const BeautyFace& f) {
    static const float kWeights[4][10] = {
        {0.249759f, 0.31948f, 0.053771f, 0, 0, 0, 0, 0, 0, 0},
        {0.124398f, 0.220962f, 0.137624f, 0.058678f, 0.01712f, 0, 0, 0, 0, 0},
        {0.082832f, 0.157076f, 0.126982f, 0.086591f, 0.049808f, 0.024166f, 0.00989f, 0.003414f, 0,
         0},
        {0.062087f, 0.120502f, 0.106872f, 0.086106f, 0.063023f, 0.041905f, 0.025311f, 0.013889f,
         0.006923f, 0.003135f}};
    static const float kDistances[4][10] = {
        {0, 1.35724f, 3.20254f, 0, 0, 0, 0, 0, 0, 0},
        {0, 1.46368f, 3.4159f, 5.36966f, 7.32569f, 0, 0, 0, 0, 0},
        {0, 1.48388f, 3.46245f, 5.44115f, 7.42007f, 9.39927f, 11.3788f, 13.3588f, 0, 0},
        {0, 1.49094f, 3.47888f, 5.46684f, 7.45484f, 9.44289f, 11.431f, 13.4192f, 15.4075f,
         17.3959f}};
    const int w = p.width(), h = p.height(), bw = w / 4, bh = h / 4;
    const int row = std::max(f.intensity - 1, 0);
    // One separable pass at the quarter size, stored as 8-bit like the target.
    auto pass = [&](const Picture& from, bool horizontal) {
        std::vector<uint8_t> out(size_t(bw) * bh * 4);
        for (int y = 0; y < bh; ++y) {
            for (int x = 0; x < bw; ++x) {
                const float s = (x + 0.5f) / bw, t = (y + 0.5f) / bh;
                float sum[3] = {0, 0, 0}, c[4];
                for (int k = 0; k < 10; ++k) {
                    const float ds = horizontal ? kDistances[row][k] / bw : 0.0f;
                    const float dt = horizontal ? 0.0f : kDistances[row][k] / bh;
                    for (int side : {1, -1}) {
                        if (k == 0 && side == -1) break;  // the centre tap once
                        from.sample(s + side * ds, t + side * dt, c);
                        for (int ch = 0; ch < 3; ++ch) sum[ch] += c[ch] * kWeights[row][k];
                    }
                }
                uint8_t* o = &out[(size_t(y) * bw + x) * 4];
                for (int ch = 0; ch < 3; ++ch) o[ch] = to8(sum[ch]);
                o[3] = 255;
            }
        }
        return out;
    };
    Picture a(bw, bh, pass(p, true));
    Picture b(bw, bh, pass(a, false));

    Expectation e = blank(w, h);
    for (int y = 0; y < h; ++y) {
        for (int x = 0; x < w; ++x) {
            const size_t i = size_t(y) * w + x;
            const float s = (x + 0.5f) / w, t = (y + 0.5f) / h;
            float color[4], blur[4];
            p.sample(s, t, color);
            b.sample(s, t, blur);
            const float cx = (s - f.facecoord[0]) * f.facecoord[2];
            const float cy = (t - f.facecoord[1]) * f.facecoord[3];
            const float dist = std::sqrt(cx * cx + cy * cy);
            bool skin = true, atBound = false;
            for (int k = 0; k < 3; ++k) {
                skin = skin && color[k] > f.toneMin[k] && color[k] < f.toneMax[k];
                // Equal to a bound: the GPU's reduced precision may go either way.
                atBound = atBound ||
                          std::lround(color[k] * 255) == std::lround(f.toneMin[k] * 255) ||
                          std::lround(color[k] * 255) == std::lround(f.toneMax[k] * 255);
            }
            const float outer = dist < 1.0f && skin ? 1.0f : 0.0f;
            const float inner = dist < 0.7f && skin ? 1.0f : 0.0f;
            float out[4] = {0, 0, 0, 1};
            for (int k = 0; k < 3; ++k) {
                float mid = 0.5f * (color[k] + blur[k]);
                mid += (blur[k] - mid) * 0.9f * inner;
                mid = color[k] + (0.5f * blur[k] + 0.5f * mid - color[k]) * 0.3f * outer;
                mid = 0.7f * blur[k] + 0.3f * mid;
                const float smooth = color[k] + (mid - color[k]) * 0.6f * outer;
                const float correct =
                    (color[k] * clamp01(dist - 0.7f) + smooth * clamp01(1.0f - dist)) / 0.3f;
                out[k] = dist < 0.7f ? smooth : (dist > 1.0f ? color[k] : correct);
            }
            storeColour(e, i, out);
            e.skip[i] = (skin || atBound) && (std::fabs(dist - 0.7f) < 0.005f ||
                                              std::fabs(dist - 1.0f) < 0.005f || atBound);
        }
    }
    return e;
}

std::vector<uint8_t> makeFacePicture(int width, int height) {
    std::vector<uint8_t> px = makeTestPicture(width, height, true);
    for (int y = 0; y < height; ++y) {
        for (int x = 0; x < width; ++x) {
            const float u = (x + 0.5f) / width, v = (y + 0.5f) / height;
            const float ex = (u - 0.45f) / 0.3f, ey = (v - 0.5f) / 0.35f;
            if (ex * ex + ey * ey >= 1.0f) continue;
            // Skin with texture at the blur's scale (a few quarter-size pixels)
            // and finer: what the smoothing should soften.
            const float grain =
                14.0f * std::sin(x * 0.35f) * std::sin(y * 0.3f) + 6.0f * std::sin(x * 1.3f + y);
            uint8_t* p = &px[(size_t(y) * width + x) * 4];
            p[0] = static_cast<uint8_t>(std::clamp(222.0f + grain - 30.0f * ey, 0.0f, 255.0f));
            p[1] = static_cast<uint8_t>(std::clamp(170.0f + grain - 25.0f * ey, 0.0f, 255.0f));
            p[2] =
                static_cast<uint8_t>(std::clamp(140.0f + grain * 0.8f - 20.0f * ey, 0.0f, 255.0f));
        }
    }
    return px;
}

}  // namespace lookref
