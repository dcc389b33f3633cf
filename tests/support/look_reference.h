// The looks' per-pixel math written again on the CPU from their formulas (not
// from the shader texts), to check what the GPU renders.
#ifndef KIV_TESTS_LOOK_REFERENCE_H
#define KIV_TESTS_LOOK_REFERENCE_H

#include <stdint.h>

#include <string>
#include <vector>

#include "support/test_picture.h"

namespace lookref {

// The ids of the thirteen fixed looks.
const std::vector<int>& lookIds();

// An RGBA8 picture as the shader's sampler sees it (row 0 at texture t = 0).
class Picture {
public:
    Picture(int width, int height, std::vector<uint8_t> rgba);
    int width() const { return mWidth; }
    int height() const { return mHeight; }
    const std::vector<uint8_t>& rgba() const { return mRgba; }
    // GL_LINEAR sample with GL_CLAMP_TO_EDGE at (s, t), channels in 0..1.
    void sample(float s, float t, float out[4]) const;

private:
    float texel(int x, int y, int channel) const;
    int mWidth;
    int mHeight;
    std::vector<uint8_t> mRgba;
};

// Expected RGBA8 target content of the look drawn over the picture with the
// identity mapping and, per pixel, whether it sits within a hair of one of the
// look's hard thresholds (where the GPU may legitimately land on the other side).
std::vector<uint8_t> render(int look, const Picture& picture, std::vector<bool>* nearThreshold);

// The per-channel tolerance, in 1/255, of a look on llvmpipe.
int tolerance(int look);

// An RGBA8 result against render() within tolerance(look) over the first
// `rows` rows (all when negative), pixels near a threshold skipped (under an
// eighth of a whole picture: its flat patches sit on level boundaries).
void expectLook(int look, const Picture& picture, const uint8_t* actual, const std::string& label,
                int rows = -1);

// An RGBA8 result against an expected one over the first `rows` rows (all
// when negative) within `tolerance` (in 1/255), but pixels flagged in `skip`.
void expectPixels(const std::vector<uint8_t>& expected, const std::vector<bool>* skip,
                  const uint8_t* actual, int width, int height, int tolerance,
                  const std::string& label, int rows = -1);

// The adjustable colour effects: the uniforms of their shaders (neutral by
// default) and the colour steps, in the order a shader applies them.
struct ColourUniforms {
    float brightness = 0.0f;
    float tint[3] = {0.0f, 0.0f, 0.0f};
    float saturate = 0.0f;
    float temperature = 0.0f;
    float temperaturePositive = 0.0f;
    float contrast = 1.0f;
    float inputShadow = 0.0f;
    float outputShadow = 0.0f;
    float inputLevel = 0.5f;
    float outputLevel = 0.5f;
};
enum ColourStep { BRIGHTNESS, TINT, SATURATE, TEMPERATURE, CONTRAST, LEVELS };

// Expected RGBA8 target content (alpha 1) of those steps over the picture.
std::vector<uint8_t> renderColour(const std::vector<ColourStep>& steps, const ColourUniforms& u,
                                  const Picture& picture);

// An NV21 picture of the test content, and the RGBA the image core makes of
// it: what an effect's shader samples when the NV21 path is used.
struct Nv21Picture {
    int width, height;
    std::vector<uint8_t> nv21;
    std::vector<uint8_t> rgba;
};
Nv21Picture makeNv21Picture(int width, int height);

// Per pixel and channel, the range an RGBA8 result may land in (before the
// tolerance), and pixels too close to a hard threshold to be compared. For
// effects whose sample positions the GPU computes in reduced precision, the
// range spans the colours within `positionSlack` of the exact position.
struct Expectation {
    int width = 0, height = 0;
    std::vector<uint8_t> lo, hi;
    std::vector<bool> skip;
};
// Every pixel within [lo - tolerance, hi + tolerance]; no more than a
// `maxSkipped` share of pixels skipped.
void expectWithin(const Expectation& e, const uint8_t* actual, int tolerance,
                  const std::string& label, double maxSkipped = 0.125);

// The geometric looks (417 FisheyeSingle, 441 Embossed, 444 Ripple, 445
// Mosaic, 447 DistortionCorrection) drawn over the picture at its own size
// (camera and preview geometry = picture size), identity mapping. `time` is
// Ripple's u_time, `level` DistortionCorrection's current level.
Expectation renderGeometric(int id, const Picture& picture, float time, float level,
                            float positionSlack);

// Beauty's compose of one face over the picture (preview = picture size,
// identity mapping): intensity 1 to 4, facecoord (centre, scale), skin range.
struct BeautyFace {
    int intensity;
    float facecoord[4];
    float toneMin[3];
    float toneMax[3];
};
Expectation renderBeauty(const Picture& picture, const BeautyFace& face);

// A test picture with a face: the look picture's edges and gradients around a
// skin-coloured ellipse (centre (0.45, 0.5) of the picture, radii 0.3 x 0.35)
// with a fine, smooth texture inside.
std::vector<uint8_t> makeFacePicture(int width, int height);

using kivtest::makeTestPicture;

}  // namespace lookref

#endif
