// The built-in test picture: colour bars, gradients, fine edges and skin tones,
// so that every effect has something telling to work on.
#ifndef TOOLS_KIVIMAGING_SAMPLE_IMAGE_H
#define TOOLS_KIVIMAGING_SAMPLE_IMAGE_H

#include <stdint.h>

#include "rect.h"
#include "vccore/vc_image.h"

namespace kivcli {

constexpr int kSampleDefaultWidth = 960;
constexpr int kSampleDefaultHeight = 640;
constexpr int kSampleMinSize = 64;

// Where the patches of a width×height sample lie. Top third: eight colour
// bars. Middle third: a grey ramp over a hue ramp (left half), one-pixel
// stripes over a one-pixel checkerboard (right half). Bottom third: a light
// and a dark skin-tone patch, then a red, a green and a blue ramp.
struct SampleLayout {
    Rect bars;
    Rect greyRamp;
    Rect hueRamp;
    Rect stripes;
    Rect checker;
    Rect skinLight;
    Rect skinDark;
    Rect redRamp;
    Rect greenRamp;
    Rect blueRamp;
};

// Bars from left to right: white, yellow, cyan, green, magenta, red, blue, black.
extern const uint8_t kSampleBarColours[8][3];
extern const uint8_t kSampleSkinLight[3];
extern const uint8_t kSampleSkinDark[3];

SampleLayout sampleLayout(int width, int height);

// A new opaque "RGBA" sample picture, or null when a side is below
// kSampleMinSize or memory runs out.
VCImage* sampleCreate(int width, int height);

}  // namespace kivcli

#endif
