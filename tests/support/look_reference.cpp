// The looks restated on the CPU from their formulas, in float, with GL's
// sampling rules (texel centres, GL_LINEAR, clamp to edge); one table row per
// fixed look.
#include "support/look_reference.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdlib>
#include <utility>

#include <gtest/gtest.h>

#include "support/image_ptr.h"
#include "vccore/vc_convert.h"

namespace lookref {

namespace {

using Rgba = std::array<float, 4>;

// How close to a hard threshold a value must be for the GPU to be allowed to
// fall on the other side (its bilinear weights are quantised, its float
// rounding differs from ours).
constexpr float kThresholdMargin = 0.004f;

float clamp01(float v) {
    return std::min(std::max(v, 0.0f), 1.0f);
}
uint8_t to8(float v) {
    return static_cast<uint8_t>(std::lround(clamp01(v) * 255.0f));
}
float smoothstep(float e0, float e1, float x) {
    float t = clamp01((x - e0) / (e1 - e0));
    return t * t * (3.0f - 2.0f * t);
}
float luma(const Rgba& c) {
    return 0.299f * c[0] + 0.587f * c[1] + 0.114f * c[2];
}
float distanceTo(float s, float t, float cs, float ct) {
    return std::sqrt((s - cs) * (s - cs) + (t - ct) * (t - ct));
}
bool near(float v, float threshold) {
    return std::fabs(v - threshold) < kThresholdMargin;
}
// Near a step of floor(y * levels)?
bool nearLevel(float y, float levels) {
    float scaled = y * levels;
    return std::fabs(scaled - std::round(scaled)) < kThresholdMargin * levels;
}
Rgba at(const Picture& p, float s, float t) {
    Rgba c;
    p.sample(s, t, c.data());
    return c;
}

// Shared by the two edge-detecting looks: luma of the pixel, of its three
// up-left neighbours (0.002 texture units away), the gradient length and the
// 2x2 average.
struct Neighbourhood {
    float y, n[3], edge, average;
    Neighbourhood(const Picture& p, float s, float t, const Rgba& c) {
        const float d = 0.002f;
        y = luma(c);
        n[0] = luma(at(p, s - d, t - d));
        n[1] = luma(at(p, s, t - d));
        n[2] = luma(at(p, s - d, t));
        float gx = ((n[0] - n[1]) + (n[2] - y)) / 2.0f;
        float gy = ((n[0] - n[2]) + (n[1] - y)) / 2.0f;
        edge = std::sqrt(gx * gx + gy * gy);
        average = (y + n[0] + n[1] + n[2]) / 4.0f;
    }
};

// A fixed look: the shader's output (before the target's clamping) for the
// fragment at (s, t) whose own sample is c; *edge when it sits within a hair
// of one of the look's hard thresholds.
using Look = Rgba (*)(const Picture& p, float s, float t, Rgba c, bool* edge);
struct LookRow {
    int id;
    int tolerance;  // per channel, in 1/255, on llvmpipe
    Look look;
};

// Comic's wrinkle term multiplies the difference of two filtered neighbour
// samples by 6, and llvmpipe's bilinear weights carry 8 fractional bits, so
// near sharp edges its result may move by up to 4/255.
const LookRow kLooks[] = {
    {400, 2, [](const Picture&, float, float, Rgba c, bool*) { return c; }},
    {401, 2,  // sepia, each row clamped at 1
     [](const Picture&, float, float, Rgba c, bool*) {
         return Rgba{std::min(0.393f * c[0] + 0.769f * c[1] + 0.189f * c[2], 1.0f),
                     std::min(0.349f * c[0] + 0.686f * c[1] + 0.168f * c[2], 1.0f),
                     std::min(0.272f * c[0] + 0.536f * c[1] + 0.131f * c[2], 1.0f), c[3]};
     }},
    {402, 2,
     [](const Picture&, float, float, Rgba c, bool*) {
         return Rgba{luma(c), luma(c), luma(c), c[3]};
     }},
    {403, 2,
     [](const Picture&, float, float, Rgba c, bool*) {
         return Rgba{1.0f - c[0], 1.0f - c[1], 1.0f - c[2], c[3]};
     }},
    {408, 2,  // fade with step 64: c * (1 - k*64) + m*64/256
     [](const Picture&, float, float, Rgba c, bool*) {
         static const float k[3] = {0.00351f, 0.002075f, 0.004547f};
         static const float m[3] = {0.8125f, 0.40625f, 0.5625f};
         for (int i = 0; i < 3; ++i) c[i] = c[i] * (1.0f - k[i] * 64.0f) + m[i] * 64.0f / 256.0f;
         c[3] = 1.0f;
         return c;
     }},
    {410, 4,  // comic
     [](const Picture& p, float s, float t, Rgba c, bool* edge) {
         Neighbourhood nb(p, s, t, c);
         float u = (-0.147f * c[0] - 0.28886f * c[1] + 0.436f * c[2]) * 0.8f;
         float v = (0.615f * c[0] - 0.515f * c[1] - 0.1f * c[2]) * 0.8f;
         float wrinkle = std::fabs(nb.n[2] - nb.average);
         float y = std::max(std::floor(nb.average * 6.0f) / 6.0f - 6.0f * wrinkle, 0.0f);
         float paper = 0.738f * (0.299f + 0.587f + 0.114f);
         y = (y + paper / 4.0f) * paper;
         float keep = nb.edge > 0.08f ? 0.0f : 1.0f;
         *edge = near(nb.edge, 0.08f) || nearLevel(nb.average, 6.0f);
         return Rgba{(y + 1.14f * v) * keep, (y - 0.39f * u - 0.58f * v) * keep,
                     (y + 2.0f * u) * keep, c[3]};
     }},
    {412, 2,  // gothic noir
     [](const Picture& p, float s, float t, Rgba c, bool* edge) {
         Neighbourhood nb(p, s, t, c);
         float keep = nb.edge > 0.07f ? 0.0f : 1.0f;
         float y = keep * std::min(std::floor(nb.average * 5.0f) / 5.0f, 1.0f);
         y = (y - 0.5f) * 0.7f + 0.4f;
         y *= 1.0f - smoothstep(0.2f, 0.9f, distanceTo(s, t, 0.5f, 0.5f));
         *edge = near(nb.edge, 0.07f) || nearLevel(nb.average, 5.0f);
         return Rgba{y, y, y, c[3]};
     }},
    {415, 2,  // red, yellow and blue corner tints, weighted by 1 - distance
     [](const Picture&, float s, float t, Rgba c, bool*) {
         float d1 = 1.0f - distanceTo(s, t, 0.0f, 1.0f);
         float d2 = 1.0f - distanceTo(s, t, 1.0f, 1.0f);
         float d3 = 1.0f - distanceTo(s, t, 1.0f, 0.0f);
         static const float r[3] = {0.9f, 0.2f, 0.2f}, ye[3] = {0.9f, 0.9f, 0.2f},
                            b[3] = {0.2f, 0.2f, 0.9f};
         for (int i = 0; i < 3; ++i)
             c[i] = 0.7f * c[i] + 0.3f * r[i] * d1 + 0.2f * ye[i] * d2 + 0.2f * b[i] * d3;
         return c;
     }},
    {416, 2,
     [](const Picture&, float, float, Rgba c, bool*) {
         static const float nash[4] = {0.26f, 0.38f, 0.68f, 1.0f};
         for (int i = 0; i < 4; ++i) c[i] = 0.7f * c[i] + 0.3f * nash[i];
         return c;
     }},
    {422, 2,
     [](const Picture&, float s, float t, Rgba c, bool*) {
         float f = 1.0f - smoothstep(0.3f, 0.7f, distanceTo(s, t, 0.5f, 0.5f));
         return Rgba{c[0] * f, c[1] * f, c[2] * f, c[3]};
     }},
    {440, 2,  // white inside [0.3, 0.8] of the mean, black outside
     [](const Picture&, float, float, Rgba c, bool* edge) {
         float mean = (c[0] + c[1] + c[2]) / 3.0f;
         float g = (mean < 0.3f || mean > 0.8f) ? 0.0f : 1.0f;
         *edge = near(mean, 0.3f) || near(mean, 0.8f);
         return Rgba{g, g, g, 1.0f};
     }},
    {442, 2,  // four levels: floor(c * 4) / 3, so 1.0 gives 4/3
     [](const Picture&, float, float, Rgba c, bool*) {
         for (int i = 0; i < 3; ++i) c[i] = std::floor(c[i] * 4.0f) / 3.0f;
         c[3] = 1.0f;
         return c;
     }},
    {443, 2,  // thermal: blue to yellow to red by the mean
     [](const Picture&, float, float, Rgba c, bool*) {
         static const float kBlue[3] = {0, 0, 1}, kYellow[3] = {1, 1, 0}, kRed[3] = {1, 0, 0};
         float mean = (c[0] + c[1] + c[2]) / 3.0f;
         const float* from = mean < 0.5f ? kBlue : kYellow;
         const float* to = mean < 0.5f ? kYellow : kRed;
         float w = mean < 0.5f ? mean / 0.5f : (mean - 0.5f) / 0.5f;
         Rgba o{0, 0, 0, 1};
         for (int i = 0; i < 3; ++i) o[i] = from[i] + (to[i] - from[i]) * w;
         return o;
     }},
};

const LookRow* row(int look) {
    for (const LookRow& r : kLooks)
        if (r.id == look) return &r;
    return nullptr;
}

// Every pixel among the first n within [lo - tolerance, hi + tolerance] but
// those flagged in skip; the first one that is not, named.
void expectRange(const uint8_t* lo, const uint8_t* hi, const std::vector<bool>* skip,
                 const uint8_t* actual, int width, size_t n, int tolerance,
                 const std::string& label) {
    size_t bad = 0;
    std::string first;
    for (size_t i = 0; i < n; ++i) {
        if (skip != nullptr && (*skip)[i]) continue;
        for (int ch = 0; ch < 4; ++ch) {
            const int got = actual[i * 4 + ch], l = lo[i * 4 + ch], h = hi[i * 4 + ch];
            if (got >= l - tolerance && got <= h + tolerance) continue;
            if (bad++ == 0)
                first = std::to_string(i % width) + "," + std::to_string(i / width) + " ch" +
                        std::to_string(ch) + " want " + std::to_string(l) +
                        (l == h ? "" : ".." + std::to_string(h)) + " got " + std::to_string(got);
            break;
        }
    }
    EXPECT_EQ(0u, bad) << label << ": first bad pixel " << first;
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
    Rgba lo, hi;
    explicit Range(const Rgba& c) : lo(c), hi(c) {}
    void add(const Rgba& c) {
        for (int k = 0; k < 4; ++k) {
            lo[k] = std::min(lo[k], c[k]);
            hi[k] = std::max(hi[k], c[k]);
        }
    }
    void store(Expectation& e, size_t i) const {
        for (int k = 0; k < 4; ++k) {
            e.lo[i * 4 + k] = to8(lo[k]);
            e.hi[i * 4 + k] = to8(hi[k]);
        }
    }
};

Range sampleRange(const Picture& p, float s, float t, float slack) {
    Range r(at(p, s, t));
    for (int dy = -1; dy <= 1; ++dy)
        for (int dx = -1; dx <= 1; ++dx)
            if (slack != 0.0f && (dx != 0 || dy != 0)) r.add(at(p, s + dx * slack, t + dy * slack));
    return r;
}

// The lopsided 3x3 relief: -8 on the neighbour below, +1 on the pixel.
bool embossed(const Picture& p, float s, float t, Rgba* out) {
    const float sx = 1.0f / p.width(), sy = 1.0f / p.height();
    const float pos[9][2] = {{s - sx, t - sy}, {s - sx, t}, {s - sx, t + sx},
                             {s, t - sy},      {s, t + sy}, {s, t},
                             {s + sx, t - sy}, {s + sx, t}, {s + sx, t + sy}};
    Rgba n[9];
    for (int i = 0; i < 9; ++i) n[i] = at(p, pos[i][0], pos[i][1]);
    float m = 0.0f;
    for (int k = 0; k < 3; ++k) {
        float sum = 0;
        for (int i : {0, 1, 2, 3, 5, 6, 7, 8}) sum += n[i][k];
        m = std::max(m, 1.0f - (sum - 8.0f * n[4][k]));
    }
    bool nearBound = std::fabs(m - 0.2f) < 0.02f;
    if (m <= 0.2f) m = 0.3f;
    m = m * m;
    float f = 1.0f / (1.0f + 0.25f / m) + 0.1f;
    *out = Rgba{f, f, f, 1.0f};
    return nearBound;
}

}  // namespace

const std::vector<int>& lookIds() {
    static const std::vector<int> ids = [] {
        std::vector<int> out;
        for (const LookRow& r : kLooks) out.push_back(r.id);
        return out;
    }();
    return ids;
}

Picture::Picture(int width, int height, std::vector<uint8_t> rgba)
    : mWidth(width), mHeight(height), mRgba(std::move(rgba)) {}

float Picture::texel(int x, int y, int channel) const {
    x = std::min(std::max(x, 0), mWidth - 1);
    y = std::min(std::max(y, 0), mHeight - 1);
    return mRgba[(static_cast<size_t>(y) * mWidth + x) * 4 + channel] / 255.0f;
}

void Picture::sample(float s, float t, float out[4]) const {
    float fx = s * mWidth - 0.5f;
    float fy = t * mHeight - 0.5f;
    int x0 = static_cast<int>(std::floor(fx));
    int y0 = static_cast<int>(std::floor(fy));
    float ax = fx - x0;
    float ay = fy - y0;
    for (int ch = 0; ch < 4; ++ch) {
        float top = texel(x0, y0, ch) * (1 - ax) + texel(x0 + 1, y0, ch) * ax;
        float bottom = texel(x0, y0 + 1, ch) * (1 - ax) + texel(x0 + 1, y0 + 1, ch) * ax;
        out[ch] = top * (1 - ay) + bottom * ay;
    }
}

std::vector<uint8_t> render(int look, const Picture& p, std::vector<bool>* nearThreshold) {
    const size_t n = static_cast<size_t>(p.width()) * p.height();
    std::vector<uint8_t> out(n * 4);
    if (nearThreshold) nearThreshold->assign(n, false);
    const LookRow* r = row(look);
    for (size_t i = 0; i < n; ++i) {
        const float s = (i % p.width() + 0.5f) / p.width(), t = (i / p.width() + 0.5f) / p.height();
        bool edge = false;
        const Rgba o = r != nullptr ? r->look(p, s, t, at(p, s, t), &edge) : Rgba{-1, -1, -1, -1};
        for (int ch = 0; ch < 4; ++ch) out[i * 4 + ch] = to8(o[ch]);
        if (nearThreshold) (*nearThreshold)[i] = edge;
    }
    return out;
}

int tolerance(int look) {
    const LookRow* r = row(look);
    return r != nullptr ? r->tolerance : 2;
}

void expectPixels(const std::vector<uint8_t>& expected, const std::vector<bool>* skip,
                  const uint8_t* actual, int width, int height, int tolerance,
                  const std::string& label, int rows) {
    expectRange(expected.data(), expected.data(), skip, actual, width,
                size_t(width) * (rows < 0 ? height : rows), tolerance, label);
}

void expectLook(int look, const Picture& picture, const uint8_t* actual, const std::string& label,
                int rows) {
    std::vector<bool> nearThreshold;
    std::vector<uint8_t> expected = render(look, picture, &nearThreshold);
    const std::string name = label + " look " + std::to_string(look);
    expectPixels(expected, &nearThreshold, actual, picture.width(), picture.height(),
                 tolerance(look), name, rows);
    if (rows < 0) {
        const size_t skipped = std::count(nearThreshold.begin(), nearThreshold.end(), true);
        EXPECT_LT(skipped * 8, nearThreshold.size()) << name << ": too many skipped";
    }
}

void expectWithin(const Expectation& e, const uint8_t* actual, int tolerance,
                  const std::string& label, double maxSkipped) {
    const size_t n = size_t(e.width) * e.height;
    expectRange(e.lo.data(), e.hi.data(), &e.skip, actual, e.width, n, tolerance, label);
    const size_t skipped = std::count(e.skip.begin(), e.skip.end(), true);
    EXPECT_LE(double(skipped), maxSkipped * n) << label << ": too many pixels skipped";
}

std::vector<uint8_t> renderColour(const std::vector<ColourStep>& steps, const ColourUniforms& u,
                                  const Picture& p) {
    const size_t n = static_cast<size_t>(p.width()) * p.height();
    std::vector<uint8_t> out(n * 4);
    for (size_t i = 0; i < n; ++i) {
        Rgba c = at(p, (i % p.width() + 0.5f) / p.width(), (i / p.width() + 0.5f) / p.height());
        for (ColourStep step : steps) {
            switch (step) {
                case BRIGHTNESS:
                    for (int k = 0; k < 3; ++k) c[k] *= 1.0f + u.brightness;
                    break;
                case TINT:  // pulls each channel towards 1 by the tint's share
                    for (int k = 0; k < 3; ++k) c[k] = u.tint[k] * (1.0f - c[k]) + c[k];
                    break;
                case SATURATE: {  // away from the (approximate) mean by u_saturate
                    float mean = (c[0] + c[1] + c[2]) * 0.333f;
                    for (int k = 0; k < 3; ++k) c[k] = c[k] + (mean - c[k]) * -u.saturate;
                    break;
                }
                case TEMPERATURE: {
                    float r = c[0] + c[0] * (1.0f - c[0]) * u.temperature;
                    float g = c[1] + c[1] * (1.0f - c[1]) * u.temperaturePositive;
                    float b = c[2] - c[2] * (1.0f - c[2]) * u.temperature;
                    float top = std::max(std::max(r, 1.0f), std::max(g, b));
                    c = Rgba{r / top, g / top, b / top, c[3]};
                    break;
                }
                case CONTRAST:
                    for (int k = 0; k < 3; ++k) c[k] = (c[k] - 0.5f) * u.contrast + 0.5f;
                    break;
                case LEVELS:
                    for (int k = 0; k < 3; ++k)
                        c[k] = clamp01((c[k] - u.inputShadow) / u.inputLevel * u.outputLevel +
                                       u.outputShadow);
                    break;
            }
        }
        c[3] = 1.0f;
        for (int ch = 0; ch < 4; ++ch) out[i * 4 + ch] = to8(c[ch]);
    }
    return out;
}

Nv21Picture makeNv21Picture(int width, int height) {
    std::vector<uint8_t> rgba = makeTestPicture(width, height, true);
    Nv21Picture p{width, height,
                  std::vector<uint8_t>(VCImage_requiredSize(width, height, VC_FORMAT_NV21)),
                  std::vector<uint8_t>(rgba.size())};
    ImagePtr yuv = VCImageTest_wrap(p.nv21.data(), width, height, VC_FORMAT_NV21);
    EXPECT_EQ(0, VCImage_convert(VCImageTest_wrap(rgba.data(), width, height, VC_FORMAT_RGBA).get(),
                                 yuv.get()));
    EXPECT_EQ(
        0, VCImage_convert(yuv.get(),
                           VCImageTest_wrap(p.rgba.data(), width, height, VC_FORMAT_RGBA).get()));
    return p;
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
                    Rgba c;
                    e.skip[i] = embossed(p, s, t, &c);
                    Range(c).store(e, i);
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
            r.store(e, i);
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
                float sum[3] = {0, 0, 0};
                for (int k = 0; k < 10; ++k) {
                    const float ds = horizontal ? kDistances[row][k] / bw : 0.0f;
                    const float dt = horizontal ? 0.0f : kDistances[row][k] / bh;
                    for (int side : {1, -1}) {
                        if (k == 0 && side == -1) break;  // the centre tap once
                        const Rgba c = at(from, s + side * ds, t + side * dt);
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
            const Rgba color = at(p, s, t), blur = at(b, s, t);
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
            Rgba out{0, 0, 0, 1};
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
            Range(out).store(e, i);
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
