#include "core/filters/sce/colorEffects.h"

#define VC_SOURCE "core/filters/sce/contrast"

const char Contrast::kEffectName[] = "Contrast";
const char* const Contrast::kParameterKeys[] = {"intensity", nullptr};

Contrast::Contrast() : KivParameterOption(COLOR_CONTRAST) {}

int Contrast::loadPartialFragmentShader(EglProgram& program, const char*, unsigned int& shaderId) {
    return loadFullShader(program, shaderId, VC_SOURCE, __LINE__);
}

int Contrast::onDrawFrame(EglProgram& program) {
    return drawFullShader(program, nullptr, VC_SOURCE, __LINE__);
}

// A key that is absent or unreadable gives the neutral value.
void Contrast::applyParameter(const char* text) {
    ColorParameters p;
    p.setContrast(VCOption_ParseStringI(text, "intensity", 0));
    setParameters(p);
}
