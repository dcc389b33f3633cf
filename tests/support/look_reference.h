// Plain C++ restatement of the fixed looks' per-pixel math, used to check what
// the GPU renders. Each look is written again from its formula, in float, with
// GL's sampling rules (texel centres, GL_LINEAR filtering, clamp to edge), not
// by reusing the shader text.
#ifndef KIV_TESTS_LOOK_REFERENCE_H
#define KIV_TESTS_LOOK_REFERENCE_H

#include <stdint.h>

#include <string>
#include <vector>

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

    // GL_LINEAR sample with GL_CLAMP_TO_EDGE at texture coordinates (s, t),
    // channels in 0..1.
    void sample(float s, float t, float out[4]) const;

private:
    float texel(int x, int y, int channel) const;

    int mWidth;
    int mHeight;
    std::vector<uint8_t> mRgba;
};

struct Expected {
    float rgba[4];  // as the shader returns it, before the target's clamping
    // True when the pixel sits within a hair of one of the look's hard
    // thresholds (a floor() step, an edge cut-off, a band limit), where the GPU's
    // filtering precision may legitimately land on the other side.
    bool nearThreshold;
};

// The look's shader output for the fragment at pixel (x, y) of a target of the
// picture's size drawn with the identity texture mapping (v_texcoord at the
// pixel centre).
Expected evaluate(int look, const Picture& picture, int x, int y);

// Expected RGBA8 target content (clamped and rounded) and, per pixel, whether
// it is near a threshold.
std::vector<uint8_t> render(int look, const Picture& picture, std::vector<bool>* nearThreshold);

// Compares an RGBA8 result with render()'s expectation within `tolerance` per
// channel, skipping pixels near a threshold. Returns the number of pixels off
// and sets `skipped` (may be null) and `firstBad` ("x,y chN want A got B").
size_t compare(int look, const Picture& picture, const uint8_t* actual, int tolerance,
               size_t* skipped, std::string* firstBad);

// Deterministic test picture: smooth gradients with sharp-edged blocks and a
// few flat patches, alpha varying unless opaque.
std::vector<uint8_t> makeTestPicture(int width, int height, bool opaque);

}  // namespace lookref

#endif
