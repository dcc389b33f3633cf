#include "support/look_reference.h"

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <utility>

#include <gtest/gtest.h>

#include "vccore/vc_convert.h"
#include "vccore/vc_image.h"

namespace lookref {

namespace {

struct Expected {
    float rgba[4];  // as the shader returns it, before the target's clamping
    bool nearThreshold;
};

// How close to a hard threshold a value must be for the GPU to be allowed to
// fall on the other side (its bilinear weights are quantised, its float
// rounding differs from ours).
constexpr float kThresholdMargin = 0.004f;

float clamp01(float v) {
    return std::min(std::max(v, 0.0f), 1.0f);
}

float smoothstep(float e0, float e1, float x) {
    float t = clamp01((x - e0) / (e1 - e0));
    return t * t * (3.0f - 2.0f * t);
}

float luma(const float c[4]) {
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

// Shared by the two edge-detecting looks: luma of the pixel, of its three
// up-left neighbours (0.002 texture units away), the gradient length and the
// 2x2 average.
struct Neighbourhood {
    float y;
    float n[3];
    float edge;
    float average;
};

Neighbourhood neighbourhood(const Picture& p, float s, float t, const float c[4]) {
    const float d = 0.002f;
    float tmp[4];
    Neighbourhood nb;
    nb.y = luma(c);
    p.sample(s - d, t - d, tmp);
    nb.n[0] = luma(tmp);
    p.sample(s, t - d, tmp);
    nb.n[1] = luma(tmp);
    p.sample(s - d, t, tmp);
    nb.n[2] = luma(tmp);
    float gx = ((nb.n[0] - nb.n[1]) + (nb.n[2] - nb.y)) / 2.0f;
    float gy = ((nb.n[0] - nb.n[2]) + (nb.n[1] - nb.y)) / 2.0f;
    nb.edge = std::sqrt(gx * gx + gy * gy);
    nb.average = (nb.y + nb.n[0] + nb.n[1] + nb.n[2]) / 4.0f;
    return nb;
}

Expected comic(const Picture& p, float s, float t, const float c[4]) {
    Expected e{{c[0], c[1], c[2], c[3]}, false};
    Neighbourhood nb = neighbourhood(p, s, t, c);
    float u = (-0.147f * c[0] - 0.28886f * c[1] + 0.436f * c[2]) * 0.8f;
    float v = (0.615f * c[0] - 0.515f * c[1] - 0.1f * c[2]) * 0.8f;
    float wrinkle = std::fabs(nb.n[2] - nb.average);
    float y = std::max(std::floor(nb.average * 6.0f) / 6.0f - 6.0f * wrinkle, 0.0f);
    float paper = 0.738f * (0.299f + 0.587f + 0.114f);
    y = (y + paper / 4.0f) * paper;
    float keep = nb.edge > 0.08f ? 0.0f : 1.0f;
    e.rgba[0] = (y + 1.14f * v) * keep;
    e.rgba[1] = (y - 0.39f * u - 0.58f * v) * keep;
    e.rgba[2] = (y + 2.0f * u) * keep;
    e.nearThreshold = near(nb.edge, 0.08f) || nearLevel(nb.average, 6.0f);
    return e;
}

Expected gothicNoir(const Picture& p, float s, float t, const float c[4]) {
    Neighbourhood nb = neighbourhood(p, s, t, c);
    float keep = nb.edge > 0.07f ? 0.0f : 1.0f;
    float y = keep * std::min(std::floor(nb.average * 5.0f) / 5.0f, 1.0f);
    y = (y - 0.5f) * 0.7f + 0.4f;
    y *= 1.0f - smoothstep(0.2f, 0.9f, distanceTo(s, t, 0.5f, 0.5f));
    Expected e{{y, y, y, c[3]}, near(nb.edge, 0.07f) || nearLevel(nb.average, 5.0f)};
    return e;
}

Expected thermal(const float c[4]) {
    static const float kBlue[3] = {0, 0, 1}, kYellow[3] = {1, 1, 0}, kRed[3] = {1, 0, 0};
    float mean = (c[0] + c[1] + c[2]) / 3.0f;
    const float* from = mean < 0.5f ? kBlue : kYellow;
    const float* to = mean < 0.5f ? kYellow : kRed;
    float w = mean < 0.5f ? mean / 0.5f : (mean - 0.5f) / 0.5f;
    Expected e{{0, 0, 0, 1}, false};
    for (int i = 0; i < 3; ++i) e.rgba[i] = from[i] + (to[i] - from[i]) * w;
    return e;
}

}  // namespace

const std::vector<int>& lookIds() {
    static const std::vector<int> ids = {400, 401, 402, 403, 408, 410, 412,
                                         415, 416, 422, 440, 442, 443};
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

// The look's shader output for the fragment at the centre of pixel (x, y).
static Expected evaluate(int look, const Picture& p, int x, int y) {
    const float s = (x + 0.5f) / p.width();
    const float t = (y + 0.5f) / p.height();
    float c[4];
    p.sample(s, t, c);
    Expected e{{c[0], c[1], c[2], c[3]}, false};
    float* o = e.rgba;
    switch (look) {
        case 400:
            break;
        case 401:  // sepia, each row clamped at 1
            o[0] = std::min(0.393f * c[0] + 0.769f * c[1] + 0.189f * c[2], 1.0f);
            o[1] = std::min(0.349f * c[0] + 0.686f * c[1] + 0.168f * c[2], 1.0f);
            o[2] = std::min(0.272f * c[0] + 0.536f * c[1] + 0.131f * c[2], 1.0f);
            break;
        case 402:
            o[0] = o[1] = o[2] = luma(c);
            break;
        case 403:
            for (int i = 0; i < 3; ++i) o[i] = 1.0f - c[i];
            break;
        case 408: {  // fade with step 64: c * (1 - k*64) + m*64/256
            static const float k[3] = {0.00351f, 0.002075f, 0.004547f};
            static const float m[3] = {0.8125f, 0.40625f, 0.5625f};
            for (int i = 0; i < 3; ++i) o[i] = c[i] * (1.0f - k[i] * 64.0f) + m[i] * 64.0f / 256.0f;
            o[3] = 1.0f;
            break;
        }
        case 410:
            return comic(p, s, t, c);
        case 412:
            return gothicNoir(p, s, t, c);
        case 415: {  // red, yellow and blue corner tints, weighted by 1 - distance
            float d1 = 1.0f - distanceTo(s, t, 0.0f, 1.0f);
            float d2 = 1.0f - distanceTo(s, t, 1.0f, 1.0f);
            float d3 = 1.0f - distanceTo(s, t, 1.0f, 0.0f);
            static const float r[3] = {0.9f, 0.2f, 0.2f}, ye[3] = {0.9f, 0.9f, 0.2f},
                               b[3] = {0.2f, 0.2f, 0.9f};
            for (int i = 0; i < 3; ++i)
                o[i] = 0.7f * c[i] + 0.3f * r[i] * d1 + 0.2f * ye[i] * d2 + 0.2f * b[i] * d3;
            break;
        }
        case 416: {
            static const float nash[4] = {0.26f, 0.38f, 0.68f, 1.0f};
            for (int i = 0; i < 4; ++i) o[i] = 0.7f * c[i] + 0.3f * nash[i];
            break;
        }
        case 422: {
            float f = 1.0f - smoothstep(0.3f, 0.7f, distanceTo(s, t, 0.5f, 0.5f));
            for (int i = 0; i < 3; ++i) o[i] = c[i] * f;
            break;
        }
        case 440: {  // white inside [0.3, 0.8] of the mean, black outside
            float mean = (c[0] + c[1] + c[2]) / 3.0f;
            float g = (mean < 0.3f || mean > 0.8f) ? 0.0f : 1.0f;
            o[0] = o[1] = o[2] = g;
            o[3] = 1.0f;
            e.nearThreshold = near(mean, 0.3f) || near(mean, 0.8f);
            break;
        }
        case 442:  // four levels: floor(c * 4) / 3, so 1.0 gives 4/3
            for (int i = 0; i < 3; ++i) o[i] = std::floor(c[i] * 4.0f) / 3.0f;
            o[3] = 1.0f;
            break;
        case 443:
            return thermal(c);
        default:
            o[0] = o[1] = o[2] = o[3] = -1.0f;
            break;
    }
    return e;
}

std::vector<uint8_t> render(int look, const Picture& p, std::vector<bool>* nearThreshold) {
    const size_t n = static_cast<size_t>(p.width()) * p.height();
    std::vector<uint8_t> out(n * 4);
    if (nearThreshold) nearThreshold->assign(n, false);
    for (size_t i = 0; i < n; ++i) {
        Expected e = evaluate(look, p, int(i % p.width()), int(i / p.width()));
        for (int ch = 0; ch < 4; ++ch)
            out[i * 4 + ch] = static_cast<uint8_t>(std::lround(clamp01(e.rgba[ch]) * 255.0f));
        if (nearThreshold) (*nearThreshold)[i] = e.nearThreshold;
    }
    return out;
}

// Comic's wrinkle term multiplies the difference of two filtered neighbour
// samples by 6, and llvmpipe's bilinear weights carry 8 fractional bits, so near
// sharp edges its result may move by up to 4/255.
int tolerance(int look) {
    return look == 410 ? 4 : 2;
}

void expectPixels(const std::vector<uint8_t>& expected, const std::vector<bool>* skip,
                  const uint8_t* actual, int width, int height, int tolerance,
                  const std::string& label, int rows) {
    const size_t n = size_t(width) * (rows < 0 ? height : rows);
    size_t bad = 0;
    std::string first;
    for (size_t i = 0; i < n; ++i) {
        if (skip != nullptr && (*skip)[i]) continue;
        for (int ch = 0; ch < 4; ++ch) {
            int want = expected[i * 4 + ch], got = actual[i * 4 + ch];
            if (std::abs(want - got) <= tolerance) continue;
            if (bad++ == 0)
                first = std::to_string(i % width) + "," + std::to_string(i / width) + " ch" +
                        std::to_string(ch) + " want " + std::to_string(want) + " got " +
                        std::to_string(got);
            break;
        }
    }
    EXPECT_EQ(0u, bad) << label << ": first bad pixel " << first;
}

void expectLook(int look, const Picture& picture, const uint8_t* actual, const std::string& label,
                int rows) {
    std::vector<bool> nearThreshold;
    std::vector<uint8_t> expected = render(look, picture, &nearThreshold);
    expectPixels(expected, &nearThreshold, actual, picture.width(), picture.height(),
                 tolerance(look), label + " look " + std::to_string(look), rows);
    if (rows < 0) {
        size_t n = size_t(picture.width()) * picture.height(), skipped = 0;
        for (bool b : nearThreshold) skipped += b;
        EXPECT_LT(skipped * 8, n) << label << " look " << look << ": too many skipped";
    }
}

std::vector<uint8_t> renderColour(const std::vector<ColourStep>& steps, const ColourUniforms& u,
                                  const Picture& p) {
    const size_t n = static_cast<size_t>(p.width()) * p.height();
    std::vector<uint8_t> out(n * 4);
    for (size_t i = 0; i < n; ++i) {
        float c[4];
        p.sample((i % p.width() + 0.5f) / p.width(), (i / p.width() + 0.5f) / p.height(), c);
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
                    c[0] = r / top;
                    c[1] = g / top;
                    c[2] = b / top;
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
        for (int ch = 0; ch < 4; ++ch)
            out[i * 4 + ch] = static_cast<uint8_t>(std::lround(clamp01(c[ch]) * 255.0f));
    }
    return out;
}

Nv21Picture makeNv21Picture(int width, int height) {
    Nv21Picture p{width, height, {}, {}};
    std::vector<uint8_t> rgba = makeTestPicture(width, height, true);
    VCImage* src = VCImage_createWrap(rgba.data(), width, height, VC_FORMAT_RGBA, 0, 0);
    VCImage* yuv = VCImage_createNew(width, height, VC_FORMAT_NV21);
    VCImage* back = VCImage_createNew(width, height, VC_FORMAT_RGBA);
    EXPECT_EQ(0, VCImage_convert(src, yuv));
    EXPECT_EQ(0, VCImage_convert(yuv, back));
    p.nv21.assign(yuv->data, yuv->data + VCImage_size(yuv));
    p.rgba.assign(back->data, back->data + VCImage_size(back));
    VCImage_destroy(src);
    VCImage_destroy(yuv);
    VCImage_destroy(back);
    return p;
}

}  // namespace lookref
