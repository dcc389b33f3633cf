// The adjustable colour effects, one case a parameter text: the uniforms it
// sets, the warnings for what it cannot use, and the picture through the
// buffered processor against a CPU statement of the colour steps. The NV21
// input path of every look: tests/processor. Load failures and GL objects:
// effect_gl_test.
#include <gtest/gtest.h>

#include <algorithm>
#include <memory>
#include <string>
#include <vector>

#include "core/KivImaging.h"
#include "core/KivPixelReach.h"
#include "core/filters/sce/colorEffects.h"
#include "support/log_capture.h"
#include "support/look_reference.h"
#include "support/processor_ptr.h"
#include "vccore/vc_log.h"

namespace {

using namespace lookref;
using Steps = std::vector<ColourStep>;

// llvmpipe lands within 1/255 of the CPU almost everywhere (its mediump
// arithmetic and the final rounding); CustomColor with every control at an
// end amplifies that rounding about tenfold (saturation 1, contrast 2, levels
// x3) and reaches 2/255. A wrong constant or a step out of order moves pixels
// by far more.
constexpr int kTolerance = 2;

// Each effect's colour steps, in the order its shader applies them.
// clang-format off
Steps stepsOf(int id) {
    switch (id) {
        case 427: return {SATURATE, TEMPERATURE, CONTRAST, LEVELS};
        case 430: return {TINT, SATURATE, CONTRAST, LEVELS};
        case 431: return {BRIGHTNESS};
        case 432: return {TEMPERATURE};
        case 433: return {CONTRAST};
        case 434: return {SATURATE};
        case 435: return {TINT};
        case 436: return {LEVELS};
        default: return {TINT, SATURATE, TEMPERATURE, CONTRAST, LEVELS};  // 425, 426, 428, 429
    }
}
// clang-format on

// The uniforms behind each step (the tint is three components).
struct StepUniform {
    ColourStep step;
    const char* name;
    float ColourUniforms::*field;
};
const StepUniform kStepUniforms[] = {
    {BRIGHTNESS, "u_brightness", &ColourUniforms::brightness},
    {TINT, "u_tint_color", nullptr},
    {SATURATE, "u_saturate", &ColourUniforms::saturate},
    {TEMPERATURE, "u_temperature", &ColourUniforms::temperature},
    {TEMPERATURE, "u_temperature_positive", &ColourUniforms::temperaturePositive},
    {CONTRAST, "u_contrast", &ColourUniforms::contrast},
    {LEVELS, "u_input_shadow", &ColourUniforms::inputShadow},
    {LEVELS, "u_output_shadow", &ColourUniforms::outputShadow},
    {LEVELS, "u_input_level", &ColourUniforms::inputLevel},
    {LEVELS, "u_output_level", &ColourUniforms::outputLevel},
};

// Uniform values, neutral unless set.
struct U : ColourUniforms {
    U& b(float v) { return brightness = v, *this; }
    U& tn(float r, float g, float bl) { return tint[0] = r, tint[1] = g, tint[2] = bl, *this; }
    U& sa(float v) { return saturate = v, *this; }
    U& te(float t, float pos) { return temperature = t, temperaturePositive = pos, *this; }
    U& co(float v) { return contrast = v, *this; }
    U& lv(float is, float os, float il, float ol) {
        inputShadow = is, outputShadow = os, inputLevel = il, outputLevel = ol;
        return *this;
    }
};

struct Case {
    int id;
    const char* text;
    U expected;
    std::vector<std::string> warnings = {};  // every warning and error, in order
};

void PrintTo(const Case& c, std::ostream* os) {
    *os << c.id << " \"" << c.text << "\"";
}

// Every key at its default and both ends, the presets with a text they must
// ignore, and the ways a text can go wrong (the neutral or first value, and a
// warning).
// clang-format off
const Case kCases[] = {
    {431, "", U()},
    {431, "intensity=-200", U().b(-0.8f)},
    {431, "intensity=1000", U().b(4.0f), },  // no range enforced
    {431, ",intensity=60,,", U().b(0.24f)},
    {431, "intensity= 40", U().b(0.16f)},
    {433, "", U()},
    {433, "intensity=-200", U().co(0.5f)},
    {433, "intensity=200", U().co(2.0f)},
    {434, "", U()},
    {434, "intensity=-200", U().sa(-1.0f)},
    {434, "intensity=100", U().sa(0.5f)},
    {432, "", U()},
    {432, "intensity=-200", U().te(-1.0f, 0.0f)},
    {432, "intensity=200", U().te(1.0f, 0.25f)},
    {435, "", U()},
    {435, "intensity=-200", U().tn(0.0f, 0.3f, 0.0f)},
    {435, "intensity=200", U().tn(0.3f, 0.0f, 0.3f)},
    {436, "", U()},
    {436, "highlight=200,shadow=-200", U().lv(0.0f, 0.25f, 0.5f, 0.5f)},
    {436, "highlight=-200,shadow=200", U().lv(0.25f, 0.0f, 0.5f, 0.5f)},
    {436, "highlight=200", U().lv(0.0f, 0.0f, 0.5f, 0.75f)},
    {436, "shadow=-200", U().lv(0.0f, 0.25f, 0.5f, 0.25f)},
    {425, "", U()},
    {425, "TE=200,TI=200,CO=200,SA=200,HL=200,SL=200",
     U().te(1, 0.25f).tn(0.3f, 0, 0.3f).co(2).sa(1).lv(0.25f, 0, 0.25f, 0.75f)},
    {425, "TE=-200,TI=-200,CO=-200,SA=-200,HL=-200,SL=-200",
     U().te(-1, 0).tn(0, 0.3f, 0).co(0.5f).sa(-1).lv(0, 0.25f, 0.75f, 0.25f)},
    {425, "TE=100,TI=-100,CO=-100,SA=50,HL=100,SL=-100",
     U().te(0.5f, 0.125f).tn(0, 0.15f, 0).co(0.75f).sa(0.25f).lv(0, 0.125f, 0.5f, 0.5f)},
    {426, "TE=200", U().te(0.1f, 0.025f).co(1.05f).sa(0.2f).tn(0.015f, 0, 0.015f)
                        .lv(0, 0.075f, 0.5f, 0.4875f)},
    {427, "", U().te(-0.15f, 0).co(1.1f).sa(0.25f).lv(0, 0, 0.5f, 0.525f)},
    {428, "", U().te(0.2f, 0.05f).co(0.9f).sa(-0.5f).tn(0.09f, 0, 0.09f).lv(0, 0, 0.5375f, 0.5f)},
    {429, "", U().te(0.1f, 0.025f).co(0.85f).sa(-0.1f).tn(0.06f, 0, 0.06f).lv(0, 0, 0.5f, 0.55f)},
    {430, "", U().co(1.15f).sa(0.15f).tn(0, 0.045f, 0).lv(0, 0.0125f, 0.5125f, 0.4875f)},
    {431, "intensity=abc", U(),
     {"W Brightness: 'intensity=abc' could not be read; the neutral value is used"}},
    {431, "intensity=1.5", U().b(0.004f), {"W Brightness: 'intensity=1.5' read as intensity=1"}},
    {431, "intensity=50,intensity=100", U().b(0.2f),
     {"W Brightness: 'intensity' is given more than once; the first one counts"}},
    {431, "xintensity=5,intensity=100", U(),
     {"W Brightness: unknown parameter 'xintensity' ignored",
      "W Brightness: 'intensity=100' could not be read; the neutral value is used"}},
    {431, "intensity", U(), {"W Brightness: 'intensity' is not a name=value pair; ignored"}},
    {431, "Intensity=60", U(), {"W Brightness: unknown parameter 'Intensity' ignored"}},
    {436, "intensity=50,shadow=-200", U().lv(0, 0.25f, 0.5f, 0.25f),
     {"W HighlightShadow: unknown parameter 'intensity' ignored"}},
    {425, "SL=x,HL=200", U().lv(0, 0, 0.5f, 0.75f),
     {"W CustomColor: 'SL=x' could not be read; the neutral value is used"}},
    {425, "te=50", U(), {"W CustomColor: unknown parameter 'te' ignored"}},
};
// clang-format on

bool isPreset(int id) {
    return id >= 426 && id <= 430;
}

// One processor for the whole suite: each call builds its own program.
class ColorEffectCase : public ::testing::TestWithParam<Case> {
protected:
    static void SetUpTestSuite() { sProcessor = ProcessorTest_create(); }
    static void TearDownTestSuite() { sProcessor.reset(); }
    static inline ProcessorPtr sProcessor;
};

TEST_P(ColorEffectCase, SetsItsUniformsWarnsAndDrawsAsTheCpu) {
    const Case& c = GetParam();
    std::unique_ptr<KivFilter> f(KivImaging_create(c.id, nullptr));
    auto* effect = dynamic_cast<ColorEffects*>(f.get());
    ASSERT_NE(nullptr, effect);
    // One "parameter" option (none for the presets), no CPU path, and each
    // output pixel from its own input pixel only.
    ASSERT_EQ(isPreset(c.id) ? 0 : 1, KivImaging_getOptionsCount(f.get()));
    if (!isPreset(c.id)) {
        EXPECT_STREQ("parameter", KivImaging_listOptionNames(f.get())[0]);
        EXPECT_EQ(nullptr, KivImaging_listOptionNames(f.get())[1]);
        int key = static_cast<int>(VCOption_FindIdByName("parameter"));
        EXPECT_EQ(1, KivImaging_setOptionByIdS(f.get(), key, "intensity=10"));
        EXPECT_EQ(1, KivImaging_setOptionByNameS(f.get(), "parameter", "intensity=10"));
    }
    EXPECT_EQ(VC_ERROR_UNSUPPORTED, f->doEffect());
    EXPECT_EQ(KivPixelReach::SAME_PIXEL, KivFilter_pixelReach(f.get(), 640, 480).kind);
    // Something else first, so that the text must replace every value.
    f->setOption("parameter", "intensity=77,highlight=77,shadow=77,TE=7,TI=7,CO=7,SA=7,HL=7");
    {
        LogCapture log;
        EXPECT_EQ(isPreset(c.id) ? 0 : 1, f->setOption("parameter", c.text));
        EXPECT_TRUE(log.matches(c.warnings));
    }
    Steps steps = stepsOf(c.id);
    for (const StepUniform& s : kStepUniforms) {
        float got[4] = {-9, -9, -9, -9};
        bool used = std::find(steps.begin(), steps.end(), s.step) != steps.end();
        int components = s.field ? 1 : 3;
        ASSERT_EQ(used ? components : 0, effect->getUniform(s.name, got)) << s.name;
        for (int k = 0; used && k < components; ++k)
            EXPECT_NEAR(s.field ? c.expected.*s.field : c.expected.tint[k], got[k], 1e-6)
                << s.name << "[" << k << "]";
    }
    if (!c.warnings.empty()) return;

    LogCapture quiet;
    ASSERT_EQ(0, sProcessor->setEffect(c.id));
    ASSERT_EQ(0, sProcessor->setEffectParameter(c.text));
    // Odd RGBA size: no symmetry hides a row or column mix-up.
    const int w = 61, h = 47;
    Picture picture(w, h, makeTestPicture(w, h, false));
    std::vector<uint8_t> out(w * h * 4, 0x5A);
    ASSERT_EQ(0,
              sProcessor->doProcessRGBA(picture.rgba().data(), w, h, out.data(), VC_FORMAT_RGBA));
    expectPixels(renderColour(steps, c.expected, picture), nullptr, out.data(), w, h, kTolerance,
                 "RGBA");
}

INSTANTIATE_TEST_SUITE_P(EveryControl, ColorEffectCase, ::testing::ValuesIn(kCases),
                         [](const ::testing::TestParamInfo<Case>& info) {
                             return std::to_string(info.param.id) + "_" +
                                    std::to_string(info.index);
                         });

// A null text is an empty one; another option name changes nothing.
TEST(ColorEffects, NullTextAndOtherNames) {
    Contrast contrast;
    float v[4];
    contrast.setOption("parameter", "intensity=200");
    EXPECT_EQ(0, contrast.setOption("intensity", "intensity=0"));
    ASSERT_EQ(1, contrast.getUniform("u_contrast", v));
    EXPECT_EQ(2.0f, v[0]);
    EXPECT_EQ(1, contrast.setOption("parameter", static_cast<const char*>(nullptr)));
    ASSERT_EQ(1, contrast.getUniform("u_contrast", v));
    EXPECT_EQ(1.0f, v[0]);
    EXPECT_EQ(KivPixelReach::WHOLE_PICTURE, KivFilter_pixelReach(nullptr, 640, 480).kind);
}

}  // namespace
