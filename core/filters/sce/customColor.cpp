#include "core/filters/sce/colorEffects.h"

#define VC_SOURCE "core/filters/sce/customColor"

const char CustomColor::kEffectName[] = "CustomColor";
const char* const CustomColor::kParameterKeys[] = {"TE", "TI", "CO", "SA", "HL", "SL", nullptr};

CustomColor::CustomColor() : KivParameterOption(COLOR_ALL_ADJUSTMENTS) {}

int CustomColor::loadPartialFragmentShader(EglProgram& program, const char*,
                                           unsigned int& shaderId) {
    return loadFullShader(program, shaderId, VC_SOURCE, __LINE__);
}

int CustomColor::onDrawFrame(EglProgram& program) {
    return drawFullShader(program, nullptr, VC_SOURCE, __LINE__);
}

// A key that is absent or unreadable gives the neutral value.
void CustomColor::applyParameter(const char* text) {
    ColorParameters p;
    p.setTemperature(VCOption_ParseStringI(text, "TE", 0));
    p.setTint(VCOption_ParseStringI(text, "TI", 0));
    p.setContrast(VCOption_ParseStringI(text, "CO", 0));
    p.setSaturate(VCOption_ParseStringI(text, "SA", 0));
    p.setLevels(VCOption_ParseStringI(text, "HL", 0), VCOption_ParseStringI(text, "SL", 0));
    setParameters(p);
}
