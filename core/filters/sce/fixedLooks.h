// The fixed looks of the single-pass family: each supplies only its snippet and its type.
#ifndef KIV_CORE_FILTERS_SCE_FIXEDLOOKS_H
#define KIV_CORE_FILTERS_SCE_FIXEDLOOKS_H

#include <math.h>

#include "core/KivPixelReach.h"
#include "core/filters/sce/singleCameraEffects.h"

// A fixed look reads the camera texel under its pixel (and the pixel's
// position) only, unless it says otherwise.
class FixedLook : public SingleCameraEffects, public KivPixelReachSource {
public:
    KivPixelReach pixelReach(int, int) const override { return {KivPixelReach::SAME_PIXEL, 0}; }
};

// Comic and GothicNoir compare each texel with neighbours 0.002 of the
// picture up and to the left: that many rows and columns, and one more that
// linear filtering blends in.
inline KivPixelReach KivEdgeLookReach(int width, int height) {
    return {KivPixelReach::NEIGHBOURS, (int)ceil(0.002 * height) + 1, (int)ceil(0.002 * width) + 1};
}

// Pass-through: copies the texel. The fallback of every processor.
class NoEffect : public FixedLook {
public:
    static const int kType = 400;
    int getFilterType() const override { return kType; }
    const char* getFragmentShader() const override;
};

// The classic sepia matrix, each channel clamped at 1, alpha kept.
class Sepia : public FixedLook {
public:
    static const int kType = 401;
    int getFilterType() const override { return kType; }
    const char* getFragmentShader() const override;
};

// Luma with weights 0.299, 0.587, 0.114; alpha kept.
class Grayscale : public FixedLook {
public:
    static const int kType = 402;
    int getFilterType() const override { return kType; }
    const char* getFragmentShader() const override;
};

// Inverted RGB, alpha kept.
class Negative : public FixedLook {
public:
    static const int kType = 403;
    int getFilterType() const override { return kType; }
    const char* getFragmentShader() const override;
};

// A fixed linear fade with step 64: per channel c * (1 - k*64) + m*64/256; opaque.
class FadedColor : public FixedLook {
public:
    static const int kType = 408;
    int getFilterType() const override { return kType; }
    const char* getFragmentShader() const override;
};

// Luma posterised in 6 levels after a 2x2 average, darkened by a wrinkle term, mixed with a
// paper intensity, rebuilt with chroma scaled by 0.8; strong edges go black.
class Comic : public FixedLook {
public:
    static const int kType = 410;
    int getFilterType() const override { return kType; }
    const char* getFragmentShader() const override;
    KivPixelReach pixelReach(int width, int height) const override {
        return KivEdgeLookReach(width, height);
    }
};

// Grey only: 5 luma levels, black edges, lowered contrast and a radial darkening.
class GothicNoir : public FixedLook {
public:
    static const int kType = 412;
    int getFilterType() const override { return kType; }
    const char* getFragmentShader() const override;
    KivPixelReach pixelReach(int width, int height) const override {
        return KivEdgeLookReach(width, height);
    }
};

// Three corner tints (red, yellow, blue) weighted by closeness; the sum may exceed 1 and
// is clamped by the target.
class Rainbow : public FixedLook {
public:
    static const int kType = 415;
    int getFilterType() const override { return kType; }
    const char* getFragmentShader() const override;
};

// 70% image, 30% of a constant blue-grey.
class InstagramNashville : public FixedLook {
public:
    static const int kType = 416;
    int getFilterType() const override { return kType; }
    const char* getFragmentShader() const override;
};

// Darkens with the distance from the centre between 0.3 and 0.7.
class Vignette : public FixedLook {
public:
    static const int kType = 422;
    int getFilterType() const override { return kType; }
    const char* getFragmentShader() const override;
};

// Mean of RGB inside [0.3, 0.8] gives white, outside black; opaque.
class BW : public FixedLook {
public:
    static const int kType = 440;
    int getFilterType() const override { return kType; }
    const char* getFragmentShader() const override;
};

// Four levels per channel (floor(c*4)/3, so 1.0 gives 4/3, clamped by the target); opaque.
class Posterize : public FixedLook {
public:
    static const int kType = 442;
    int getFilterType() const override { return kType; }
    const char* getFragmentShader() const override;
};

// Mean of RGB mapped through blue, yellow, red; opaque.
class ThermalVision : public FixedLook {
public:
    static const int kType = 443;
    int getFilterType() const override { return kType; }
    const char* getFragmentShader() const override;
};

#endif
