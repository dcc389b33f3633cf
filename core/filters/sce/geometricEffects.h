// Effects that move or sample pixels by position. Four are single-pass
// snippets whose onDrawFrame only sets their uniforms on the program's GL
// program (looked up by name every frame); DistortionCorrection owns a
// complete shader, an animated level and its own texture coordinates.
#ifndef KIV_CORE_FILTERS_SCE_GEOMETRICEFFECTS_H
#define KIV_CORE_FILTERS_SCE_GEOMETRICEFFECTS_H

#include "core/KivParameterOption.h"
#include "core/KivPixelReach.h"
#include "core/filters/sce/fullShaderEffects.h"
#include "core/filters/sce/singleCameraEffects.h"

// Square cells of 32 camera pixels across (the same texture step vertically,
// so cells are square in texture space), each showing its corner's colour.
class Mosaic : public SingleCameraEffects, public KivPixelReachSource {
public:
    static const int kType = 445;
    int getFilterType() const override { return kType; }
    const char* getFragmentShader() const override;
    int onDrawFrame(EglProgram& program) override;
    // A cell reaches back to its first row: 32 / width of the texture's height.
    KivPixelReach pixelReach(int width, int height) const override;
};

// Circular waves from the centre; the time advances 0.04 per drawn frame,
// without wrapping.
class Ripple : public SingleCameraEffects, public KivPixelReachSource {
public:
    static const int kType = 444;
    int getFilterType() const override { return kType; }
    const char* getFragmentShader() const override;
    int onDrawFrame(EglProgram& program) override;
    // Sampling moves by at most 0.04 of the height.
    KivPixelReach pixelReach(int width, int height) const override;
    float getTime() const { return mTime; }

private:
    float mTime = 0.0f;
};

// Grey relief from a lopsided 3x3 neighbourhood, one camera pixel apart.
class Embossed : public SingleCameraEffects, public KivPixelReachSource {
public:
    static const int kType = 441;
    int getFilterType() const override { return kType; }
    const char* getFragmentShader() const override;
    int onDrawFrame(EglProgram& program) override;
    // One row either way, and the neighbour that steps by a column's width
    // along y.
    KivPixelReach pixelReach(int width, int height) const override;
};

// A fish-eye lens over a centred square, black outside its circle.
class FisheyeSingle : public SingleCameraEffects, public KivPixelReachSource {
public:
    static const int kType = 417;
    int getFilterType() const override { return kType; }
    const char* getFragmentShader() const override;
    int onDrawFrame(EglProgram& program) override;
    KivPixelReach pixelReach(int, int) const override { return {KivPixelReach::WHOLE_PICTURE, 0}; }
};

// Undoes lens distortion towards a region given in camera coordinates
// ("FA" on/off, "LE", "TO", "RI", "BO" a rectangle in a frame spanning 2000
// units around 0). The correction eases in and out by 0.075 per drawn frame
// and zooms in by up to 7.5% per side.
class DistortionCorrection : public KivParameterOption<DistortionCorrection, FullShaderEffects>,
                             public KivPixelReachSource {
public:
    static const int kType = 447;
    static const char kEffectName[];
    static const char* const kParameterKeys[];
    // Class-wide and rewritten before every draw (only one such effect is
    // expected to draw at a time), four vertices each.
    static float DISTORTION_TEXCOORD[8];
    static float DISTORTION_TEXCOORD_V_FLIP[8];
    static float DISTORTION_TEXCOORD_H_FLIP[8];
    static float DISTORTION_TEXCOORD_HV_FLIP[8];

    DistortionCorrection();
    int getFilterType() const override { return kType; }
    const char* getFragmentShader() const override;
    int loadPartialFragmentShader(EglProgram& program, const char* header,
                                  unsigned int& shaderId) override;
    int onDrawFrame(EglProgram& program) override;
    KivPixelReach pixelReach(int, int) const override { return {KivPixelReach::WHOLE_PICTURE, 0}; }
    void applyParameter(const char* text);

    float getTargetLevel() const;
    float getCurrentLevel() const { return mCurrentLevel; }

private:
    float mDistortionLevel = 0.0f;  // the target, set by options
    float mCurrentLevel = 0.0f;     // render thread only
    float mDistortion = 0.0f;       // uniforms of the frame being drawn
    float mRatio = 0.0f;
};

#endif
