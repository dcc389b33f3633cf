// The adjustable colour effects: what each parameter text sets (and the
// warnings for what it could not use), and their pictures through the
// buffered processor (RGBA and NV21) against a CPU statement of the colour
// steps. Load failures and GL objects: effect_gl_test.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

#include "core/KivImaging.h"
#include "core/KivPixelReach.h"
#include "core/VFilterBufferedProcessorImpl.h"
#include "core/filters/sce/colorEffects.h"
#include "support/effect_renderer.h"
#include "support/gl_context.h"
#include "support/gl_fault.h"
#include "support/log_capture.h"
#include "support/look_reference.h"
#include "vccore/vc_log.h"

namespace {

using lookref::ColourStep;
using Steps = std::vector<ColourStep>;

// llvmpipe lands within 1/255 of the CPU almost everywhere (its mediump
// arithmetic and the final rounding); CustomColor with every control at an
// end amplifies that rounding about tenfold (saturation 1, contrast 2, levels
// x3) and reaches 2/255. A wrong constant or a step out of order moves pixels
// by far more.
constexpr int kTolerance = 2;

const Steps kAll = {lookref::TINT, lookref::SATURATE, lookref::TEMPERATURE, lookref::CONTRAST,
                    lookref::LEVELS};

// Each effect's colour steps, in the order its shader applies them.
Steps stepsOf(int id) {
    switch (id) {
        case 427:
            return {lookref::SATURATE, lookref::TEMPERATURE, lookref::CONTRAST, lookref::LEVELS};
        case 430:
            return {lookref::TINT, lookref::SATURATE, lookref::CONTRAST, lookref::LEVELS};
        case 431:
            return {lookref::BRIGHTNESS};
        case 432:
            return {lookref::TEMPERATURE};
        case 433:
            return {lookref::CONTRAST};
        case 434:
            return {lookref::SATURATE};
        case 435:
            return {lookref::TINT};
        case 436:
            return {lookref::LEVELS};
        default:  // CustomColor and Breezy, Nostalgic, Soft
            return kAll;
    }
}

// The uniforms behind each step.
struct StepUniform {
    ColourStep step;
    const char* name;
    int components;
    float lookref::ColourUniforms::*field;
};
const StepUniform kStepUniforms[] = {
    {lookref::BRIGHTNESS, "u_brightness", 1, &lookref::ColourUniforms::brightness},
    {lookref::TINT, "u_tint_color", 3, nullptr},
    {lookref::SATURATE, "u_saturate", 1, &lookref::ColourUniforms::saturate},
    {lookref::TEMPERATURE, "u_temperature", 1, &lookref::ColourUniforms::temperature},
    {lookref::TEMPERATURE, "u_temperature_positive", 1,
     &lookref::ColourUniforms::temperaturePositive},
    {lookref::CONTRAST, "u_contrast", 1, &lookref::ColourUniforms::contrast},
    {lookref::LEVELS, "u_input_shadow", 1, &lookref::ColourUniforms::inputShadow},
    {lookref::LEVELS, "u_output_shadow", 1, &lookref::ColourUniforms::outputShadow},
    {lookref::LEVELS, "u_input_level", 1, &lookref::ColourUniforms::inputLevel},
    {lookref::LEVELS, "u_output_level", 1, &lookref::ColourUniforms::outputLevel},
};

// Uniform values, neutral unless set.
struct U : lookref::ColourUniforms {
    U& b(float v) { return brightness = v, *this; }
    U& tn(float r, float g, float bl) { return tint[0] = r, tint[1] = g, tint[2] = bl, *this; }
    U& sa(float v) { return saturate = v, *this; }
    U& te(float t, float positive) {
        return temperature = t, temperaturePositive = positive, *this;
    }
    U& co(float v) { return contrast = v, *this; }
    U& lv(float is, float os, float il, float ol) {
        inputShadow = is, outputShadow = os, inputLevel = il, outputLevel = ol;
        return *this;
    }
};

// The values an effect holds now, read through getUniform.
lookref::ColourUniforms uniformsOf(KivFilter* f) {
    auto* e = dynamic_cast<FullShaderEffects*>(f);
    lookref::ColourUniforms u;
    float v[4] = {};
    for (const StepUniform& s : kStepUniforms) {
        if (e == nullptr || e->getUniform(s.name, v) == 0) continue;
        if (s.field == nullptr) {
            for (int k = 0; k < 3; ++k) u.tint[k] = v[k];
        } else {
            u.*s.field = v[0];
        }
    }
    return u;
}

struct Case {
    int id;
    const char* text;
    U expected;
    std::vector<std::string> warnings;  // exact, in order
};

void PrintTo(const Case& c, std::ostream* os) {
    *os << c.id << " \"" << c.text << "\"";
}

std::string caseName(const Case& c) {
    std::string name = std::to_string(c.id) + "_" + (c.text[0] ? c.text : "empty");
    for (char& ch : name)
        if (!isalnum(static_cast<unsigned char>(ch))) ch = '_';
    return name;
}

const float kNeg0 = -0.0f;

// Every key at its default, both ends and a middle value; the presets with a
// text they must ignore; the ways a text can go wrong.
const std::vector<Case>& cases() {
    static const std::vector<Case> list = {
        {431, "", U(), {}},
        {431, "intensity=-200", U().b(-0.8f), {}},
        {431, "intensity=200", U().b(0.8f), {}},
        {431, "intensity=100", U().b(0.4f), {}},
        {431, "intensity=1000", U().b(4.0f), {}},  // no range enforced
        {431, ",intensity=60,,", U().b(0.24f), {}},
        {431, "intensity= 40", U().b(0.16f), {}},
        {433, "", U(), {}},
        {433, "intensity=-200", U().co(0.5f), {}},
        {433, "intensity=200", U().co(2.0f), {}},
        {433, "intensity=-100", U().co(0.75f), {}},
        {434, "", U(), {}},
        {434, "intensity=-200", U().sa(-1.0f), {}},
        {434, "intensity=200", U().sa(1.0f), {}},
        {434, "intensity=100", U().sa(0.5f), {}},
        {432, "", U(), {}},
        {432, "intensity=-200", U().te(-1.0f, 0.0f), {}},
        {432, "intensity=200", U().te(1.0f, 0.25f), {}},
        {432, "intensity=100", U().te(0.5f, 0.125f), {}},
        {435, "", U().tn(0.0f, kNeg0, 0.0f), {}},
        {435, "intensity=-200", U().tn(0.0f, 0.3f, 0.0f), {}},
        {435, "intensity=200", U().tn(0.3f, 0.0f, 0.3f), {}},
        {435, "intensity=100", U().tn(0.15f, 0.0f, 0.15f), {}},
        {436, "", U(), {}},
        {436, "highlight=200,shadow=-200", U().lv(0.0f, 0.25f, 0.5f, 0.5f), {}},
        {436, "highlight=-200,shadow=200", U().lv(0.25f, 0.0f, 0.5f, 0.5f), {}},
        {436, "highlight=200", U().lv(0.0f, 0.0f, 0.5f, 0.75f), {}},
        {436, "highlight=-200", U().lv(0.0f, 0.0f, 0.75f, 0.5f), {}},
        {436, "shadow=200", U().lv(0.25f, 0.0f, 0.25f, 0.5f), {}},
        {436, "shadow=-200", U().lv(0.0f, 0.25f, 0.5f, 0.25f), {}},
        {436, "highlight=100,shadow=-100", U().lv(0.0f, 0.125f, 0.5f, 0.5f), {}},
        {425, "", U().tn(0.0f, kNeg0, 0.0f), {}},
        {425, "TE=-200", U().te(-1.0f, 0.0f).tn(0, kNeg0, 0), {}},
        {425, "TE=200", U().te(1.0f, 0.25f).tn(0, kNeg0, 0), {}},
        {425, "TI=-200", U().tn(0.0f, 0.3f, 0.0f), {}},
        {425, "TI=200", U().tn(0.3f, 0.0f, 0.3f), {}},
        {425, "CO=-200", U().co(0.5f).tn(0, kNeg0, 0), {}},
        {425, "CO=200", U().co(2.0f).tn(0, kNeg0, 0), {}},
        {425, "SA=-200", U().sa(-1.0f).tn(0, kNeg0, 0), {}},
        {425, "SA=200", U().sa(1.0f).tn(0, kNeg0, 0), {}},
        {425, "HL=-200", U().lv(0.0f, 0.0f, 0.75f, 0.5f).tn(0, kNeg0, 0), {}},
        {425, "HL=200", U().lv(0.0f, 0.0f, 0.5f, 0.75f).tn(0, kNeg0, 0), {}},
        {425, "SL=-200", U().lv(0.0f, 0.25f, 0.5f, 0.25f).tn(0, kNeg0, 0), {}},
        {425, "SL=200", U().lv(0.25f, 0.0f, 0.25f, 0.5f).tn(0, kNeg0, 0), {}},
        {425,
         "TE=100,TI=-100,CO=-100,SA=50,HL=100,SL=-100",
         U().te(0.5f, 0.125f).tn(0.0f, 0.15f, 0.0f).co(0.75f).sa(0.25f).lv(0, 0.125f, 0.5f, 0.5f),
         {}},
        {425,
         "TE=200,TI=200,CO=200,SA=200,HL=200,SL=200",
         U().te(1.0f, 0.25f).tn(0.3f, 0.0f, 0.3f).co(2.0f).sa(1.0f).lv(0.25f, 0, 0.25f, 0.75f),
         {}},
        {425,
         "TE=-200,TI=-200,CO=-200,SA=-200,HL=-200,SL=-200",
         U().te(-1.0f, 0.0f).tn(0.0f, 0.3f, 0.0f).co(0.5f).sa(-1.0f).lv(0, 0.25f, 0.75f, 0.25f),
         {}},
        // Presets ignore every text.
        {426,
         "TE=200",
         U().te(0.1f, 0.025f).co(1.05f).sa(0.2f).tn(0.015f, 0, 0.015f).lv(0, 0.075f, 0.5f, 0.4875f),
         {}},
        {427, "", U().te(-0.15f, 0).co(1.1f).sa(0.25f).lv(0, kNeg0, 0.5f, 0.525f), {}},
        {428,
         "",
         U().te(0.2f, 0.05f).co(0.9f).sa(-0.5f).tn(0.09f, 0, 0.09f).lv(0, kNeg0, 0.5375f, 0.5f),
         {}},
        {429,
         "",
         U().te(0.1f, 0.025f).co(0.85f).sa(-0.1f).tn(0.06f, 0, 0.06f).lv(0, kNeg0, 0.5f, 0.55f),
         {}},
        {430, "", U().co(1.15f).sa(0.15f).tn(0, 0.045f, 0).lv(0, 0.0125f, 0.5125f, 0.4875f), {}},
        // What a text can get wrong: the neutral value (or the first value) and a warning.
        {431,
         "intensity=abc",
         U(),
         {"Brightness: 'intensity=abc' could not be read; the neutral value is used"}},
        {431, "intensity=1.5", U().b(0.004f), {"Brightness: 'intensity=1.5' read as intensity=1"}},
        {431,
         "intensity=50,intensity=100",
         U().b(0.2f),
         {"Brightness: 'intensity' is given more than once; the first one counts"}},
        {431,
         "xintensity=5,intensity=100",
         U(),
         {"Brightness: unknown parameter 'xintensity' ignored",
          "Brightness: 'intensity=100' could not be read; the neutral value is used"}},
        {431, "intensity", U(), {"Brightness: 'intensity' is not a name=value pair; ignored"}},
        {431, "Intensity=60", U(), {"Brightness: unknown parameter 'Intensity' ignored"}},
        {436,
         "intensity=50,shadow=-200",
         U().lv(0, 0.25f, 0.5f, 0.25f),
         {"HighlightShadow: unknown parameter 'intensity' ignored"}},
        {425,
         "SL=x,HL=200",
         U().lv(0, 0, 0.5f, 0.75f).tn(0, kNeg0, 0),
         {"CustomColor: 'SL=x' could not be read; the neutral value is used"}},
        {425, "te=50", U().tn(0, kNeg0, 0), {"CustomColor: unknown parameter 'te' ignored"}},
    };
    return list;
}

bool isPreset(int id) {
    return id >= 426 && id <= 430;
}

TEST(ColorEffects, ParameterTextsSetTheirUniformsAndWarnAboutWhatTheyCannotUse) {
    for (const Case& c : cases()) {
        SCOPED_TRACE(std::to_string(c.id) + " \"" + c.text + "\"");
        std::unique_ptr<KivFilter> f(KivImaging_create(c.id, nullptr));
        ASSERT_NE(nullptr, f);
        auto* effect = dynamic_cast<ColorEffects*>(f.get());
        ASSERT_NE(nullptr, effect);
        // Something else first, so that the text must replace every value.
        f->setOption("parameter", "intensity=77,highlight=77,shadow=77,TE=7,TI=7,CO=7,SA=7,HL=7");
        LogCapture log;
        EXPECT_EQ(isPreset(c.id) ? 0 : 1, f->setOption("parameter", c.text));
        std::vector<std::string> warnings;
        for (const LoggedLine& l : log.lines())
            if (l.level == VF_LOG_WARNING) warnings.push_back(l.text);
        EXPECT_EQ(c.warnings, warnings);

        Steps steps = stepsOf(c.id);
        for (const StepUniform& s : kStepUniforms) {
            float got[4] = {-9, -9, -9, -9};
            bool used = std::find(steps.begin(), steps.end(), s.step) != steps.end();
            ASSERT_EQ(used ? s.components : 0, effect->getUniform(s.name, got)) << s.name;
            if (!used) continue;
            for (int k = 0; k < s.components; ++k) {
                float want = s.field ? c.expected.*s.field : c.expected.tint[k];
                EXPECT_NEAR(want, got[k], 1e-6) << s.name << "[" << k << "]";
                // The tint at rest is (0, -0.0, 0).
                if (s.field == nullptr && want == 0.0f) {
                    EXPECT_EQ(std::signbit(want), std::signbit(got[k])) << s.name << k;
                }
            }
        }
    }
}

TEST(ColorEffects, OptionsAndIdentity) {
    for (int id = 425; id <= 436; ++id) {
        SCOPED_TRACE(id);
        std::unique_ptr<KivFilter> f(KivImaging_create(id, nullptr));
        ASSERT_NE(nullptr, f);
        int options = isPreset(id) ? 0 : 1;
        EXPECT_EQ(options, KivImaging_getOptionsCount(f.get()));
        if (options == 1) {
            EXPECT_STREQ("parameter", KivImaging_listOptionNames(f.get())[0]);
            EXPECT_EQ(nullptr, KivImaging_listOptionNames(f.get())[1]);
            // By id through the registry's shared key, and by the C API's name setter.
            int key = static_cast<int>(VCOption_FindIdByName("parameter"));
            EXPECT_EQ(1, KivImaging_setOptionByIdS(f.get(), key, "intensity=10"));
            EXPECT_EQ(1, KivImaging_setOptionByNameS(f.get(), "parameter", "intensity=10"));
        }
        // Another option name is not handled and changes nothing.
        lookref::ColourUniforms before = uniformsOf(f.get());
        EXPECT_EQ(0, f->setOption("intensity", "intensity=150"));
        lookref::ColourUniforms after = uniformsOf(f.get());
        EXPECT_EQ(0, memcmp(&before, &after, sizeof(before)));
        EXPECT_EQ(VC_ERROR_UNSUPPORTED, f->doEffect());
        // Each output pixel comes from its own input pixel only.
        EXPECT_EQ(KivPixelReach::SAME_PIXEL, KivFilter_pixelReach(f.get(), 640, 480).kind);
    }
    EXPECT_EQ(KivPixelReach::WHOLE_PICTURE, KivFilter_pixelReach(nullptr, 640, 480).kind);
    // A null text is an empty one: every value neutral.
    Contrast contrast;
    contrast.setOption("parameter", "intensity=200");
    EXPECT_EQ(1, contrast.setOption("parameter", static_cast<const char*>(nullptr)));
    float v[4];
    ASSERT_EQ(1, contrast.getUniform("u_contrast", v));
    EXPECT_EQ(1.0f, v[0]);
}

// One processor for the whole suite: each call builds its own program.
class ColorEffectsThroughProcessor : public ::testing::TestWithParam<Case> {
protected:
    static void SetUpTestSuite() {
        sProcessor = static_cast<VFilterBufferedProcessorImpl*>(BufferedProcessor_Create());
        sProcessor->initialize();
    }
    static void TearDownTestSuite() {
        sProcessor->release();
        BufferedProcessor_Destroy(sProcessor);
        sProcessor = nullptr;
    }
    static VFilterBufferedProcessorImpl* sProcessor;
};
VFilterBufferedProcessorImpl* ColorEffectsThroughProcessor::sProcessor = nullptr;

TEST_P(ColorEffectsThroughProcessor, MatchesTheColourStepsOnTheCpu) {
    const Case& c = GetParam();
    LogCapture quiet;
    ASSERT_EQ(0, sProcessor->setEffect(c.id));
    ASSERT_EQ(0, sProcessor->setEffectParameter(c.text));
    // Odd RGBA size: no symmetry hides a row or column mix-up.
    const int w = 61, h = 47;
    lookref::Picture picture(w, h, lookref::makeTestPicture(w, h, false));
    std::vector<uint8_t> out(w * h * 4, 0x5A);
    ASSERT_EQ(0,
              sProcessor->doProcessRGBA(picture.rgba().data(), w, h, out.data(), VC_FORMAT_RGBA));
    lookref::expectPixels(lookref::renderColour(stepsOf(c.id), c.expected, picture), nullptr,
                          out.data(), w, h, kTolerance, "RGBA");

    lookref::Nv21Picture nv21 = lookref::makeNv21Picture(64, 48);
    lookref::Picture sampled(64, 48, nv21.rgba);
    out.assign(64 * 48 * 4, 0x5A);
    ASSERT_EQ(0, sProcessor->doProcessNV21(nv21.nv21.data(), 64, 48, out.data()));
    lookref::expectPixels(lookref::renderColour(stepsOf(c.id), c.expected, sampled), nullptr,
                          out.data(), 64, 48, kTolerance, "NV21");
}

std::vector<Case> drawnCases() {
    std::vector<Case> drawn;
    for (const Case& c : cases())
        if (c.warnings.empty()) drawn.push_back(c);
    return drawn;
}

INSTANTIATE_TEST_SUITE_P(EveryControl, ColorEffectsThroughProcessor,
                         ::testing::ValuesIn(drawnCases()),
                         [](const ::testing::TestParamInfo<Case>& info) {
                             return caseName(info.param);
                         });

}  // namespace
