// The adjustable colour effects: five colour operations (tint, saturation,
// temperature, contrast, levels) plus brightness, as float uniforms of one
// complete shader per effect. Six effects expose one control each through the
// "parameter" option, CustomColor all of them, and five presets fix the values.
#ifndef KIV_CORE_FILTERS_SCE_COLOREFFECTS_H
#define KIV_CORE_FILTERS_SCE_COLOREFFECTS_H

#include <string>

#include "core/KivParameterOption.h"
#include "core/KivPixelReach.h"
#include "core/filters/sce/fullShaderEffects.h"

// The colour functions a shader applies, in this order.
enum ColorFunction : unsigned {
    COLOR_BRIGHTNESS = 1u << 0,
    COLOR_TINT = 1u << 1,
    COLOR_SATURATE = 1u << 2,
    COLOR_TEMPERATURE = 1u << 3,
    COLOR_CONTRAST = 1u << 4,
    COLOR_LEVELS = 1u << 5,
    COLOR_ALL_ADJUSTMENTS =
        COLOR_TINT | COLOR_SATURATE | COLOR_TEMPERATURE | COLOR_CONTRAST | COLOR_LEVELS,
};

// Uniform values; the defaults are the neutral look.
struct ColorParameters {
    float brightness = 0.0f;
    float tintColor[3] = {0.0f, -0.0f, 0.0f};
    float saturate = 0.0f;
    float temperature = 0.0f;
    float temperaturePositive = 0.0f;
    float contrast = 1.0f;
    float inputShadow = 0.0f;
    float outputShadow = 0.0f;
    float inputLevel = 0.5f;
    float outputLevel = 0.5f;

    // The controls' integer keys (n as written, -200…200 in the user
    // interface; not enforced) turned into uniform values.
    void setBrightness(int n);
    void setContrast(int n);
    void setSaturate(int n);
    void setTemperature(int n);
    void setTint(int n);
    void setLevels(int highlight, int shadow);
};

class ColorEffects : public FullShaderEffects, public KivPixelReachSource {
public:
    // Assembled from the effect's functions: header, uniforms, functions, main.
    const char* getFragmentShader() const override { return mShaderText.c_str(); }
    KivPixelReach pixelReach(int, int) const override { return {KivPixelReach::SAME_PIXEL, 0}; }

    unsigned functions() const { return mFunctions; }

protected:
    explicit ColorEffects(unsigned functions);
    void setParameters(const ColorParameters& parameters);

private:
    unsigned mFunctions;
    ColorParameters mParameters;
    std::string mShaderText;
};

// One control, the key "intensity": u_brightness = n / 200 * 0.8.
class Brightness : public KivParameterOption<Brightness, ColorEffects> {
public:
    static const char kEffectName[];
    static const char* const kParameterKeys[];
    Brightness();
    // Temperature's id, on purpose: asking for 431 while it is loaded rebuilds it.
    int getFilterType() const override { return 432; }
    int loadPartialFragmentShader(EglProgram& program, const char* header,
                                  unsigned int& shaderId) override;
    int onDrawFrame(EglProgram& program) override;
    void applyParameter(const char* text);
};

// "intensity": u_contrast = 1 + n/200, darkening halved (1 + n/400 below 0).
class Contrast : public KivParameterOption<Contrast, ColorEffects> {
public:
    static const char kEffectName[];
    static const char* const kParameterKeys[];
    Contrast();
    int getFilterType() const override { return 433; }
    int loadPartialFragmentShader(EglProgram& program, const char* header,
                                  unsigned int& shaderId) override;
    int onDrawFrame(EglProgram& program) override;
    void applyParameter(const char* text);
};

// "intensity": u_saturate = n / 200.
class Saturate : public KivParameterOption<Saturate, ColorEffects> {
public:
    static const char kEffectName[];
    static const char* const kParameterKeys[];
    Saturate();
    int getFilterType() const override { return 434; }
    int loadPartialFragmentShader(EglProgram& program, const char* header,
                                  unsigned int& shaderId) override;
    int onDrawFrame(EglProgram& program) override;
    void applyParameter(const char* text);
};

// "intensity": u_temperature = n / 200, green follows a quarter of a warming.
class Temperature : public KivParameterOption<Temperature, ColorEffects> {
public:
    static const char kEffectName[];
    static const char* const kParameterKeys[];
    Temperature();
    int getFilterType() const override { return 432; }
    int loadPartialFragmentShader(EglProgram& program, const char* header,
                                  unsigned int& shaderId) override;
    int onDrawFrame(EglProgram& program) override;
    void applyParameter(const char* text);
};

// "intensity": towards magenta above 0, towards green below.
class TintControl : public KivParameterOption<TintControl, ColorEffects> {
public:
    static const char kEffectName[];
    static const char* const kParameterKeys[];
    TintControl();
    // CustomColor's id, on purpose: asking for 425 while it is loaded keeps it.
    int getFilterType() const override { return 425; }
    int loadPartialFragmentShader(EglProgram& program, const char* header,
                                  unsigned int& shaderId) override;
    int onDrawFrame(EglProgram& program) override;
    void applyParameter(const char* text);
};

// "highlight" and "shadow": the levels operation.
class HighlightShadow : public KivParameterOption<HighlightShadow, ColorEffects> {
public:
    static const char kEffectName[];
    static const char* const kParameterKeys[];
    HighlightShadow();
    int getFilterType() const override { return 436; }
    int loadPartialFragmentShader(EglProgram& program, const char* header,
                                  unsigned int& shaderId) override;
    int onDrawFrame(EglProgram& program) override;
    void applyParameter(const char* text);
};

// Every control: "TE" temperature, "TI" tint, "CO" contrast, "SA" saturation,
// "HL" and "SL" highlight and shadow.
class CustomColor : public KivParameterOption<CustomColor, ColorEffects> {
public:
    static const char kEffectName[];
    static const char* const kParameterKeys[];
    CustomColor();
    int getFilterType() const override { return 425; }
    int loadPartialFragmentShader(EglProgram& program, const char* header,
                                  unsigned int& shaderId) override;
    int onDrawFrame(EglProgram& program) override;
    void applyParameter(const char* text);
};

// Fixed values set once by the preset's constructor; no options.
class ColorPreset : public ColorEffects {
public:
    int loadPartialFragmentShader(EglProgram& program, const char* header,
                                  unsigned int& shaderId) override;
    int onDrawFrame(EglProgram& program) override;

protected:
    using ColorEffects::ColorEffects;
};

class Breezy : public ColorPreset {
public:
    Breezy();
    int getFilterType() const override { return 426; }

private:
    void initParameter();
};

class Vivid : public ColorPreset {
public:
    Vivid();
    int getFilterType() const override { return 427; }

private:
    void initParameter();
};

class Nostalgic : public ColorPreset {
public:
    Nostalgic();
    int getFilterType() const override { return 428; }

private:
    void initParameter();
};

class Soft : public ColorPreset {
public:
    Soft();
    int getFilterType() const override { return 429; }

private:
    void initParameter();
};

class Serene : public ColorPreset {
public:
    Serene();
    int getFilterType() const override { return 430; }

private:
    void initParameter();
};

#endif
