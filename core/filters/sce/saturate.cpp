#include "core/filters/sce/colorEffects.h"

#define VC_SOURCE "core/filters/sce/saturate"

const char Saturate::kEffectName[] = "Saturate";
const char* const Saturate::kParameterKeys[] = {"intensity", nullptr};

Saturate::Saturate() : KivParameterOption(COLOR_SATURATE) {}

int Saturate::loadPartialFragmentShader(EglProgram& program, const char*, unsigned int& shaderId) {
    return loadFullShader(program, shaderId, VC_SOURCE, __LINE__);
}

int Saturate::onDrawFrame(EglProgram& program) {
    return drawFullShader(program, nullptr, VC_SOURCE, __LINE__);
}

// A key that is absent or unreadable gives the neutral value.
void Saturate::applyParameter(const char* text) {
    ColorParameters p;
    p.setSaturate(VCOption_ParseStringI(text, "intensity", 0));
    setParameters(p);
}
