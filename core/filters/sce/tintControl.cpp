#include "core/filters/sce/colorEffects.h"

#define VC_SOURCE "core/filters/sce/tintControl"

const char TintControl::kEffectName[] = "TintControl";
const char* const TintControl::kParameterKeys[] = {"intensity", nullptr};

TintControl::TintControl() : KivParameterOption(COLOR_TINT) {}

int TintControl::loadPartialFragmentShader(EglProgram& program, const char*,
                                           unsigned int& shaderId) {
    return loadFullShader(program, shaderId, VC_SOURCE, __LINE__);
}

int TintControl::onDrawFrame(EglProgram& program) {
    return drawFullShader(program, nullptr, VC_SOURCE, __LINE__);
}

// A key that is absent or unreadable gives the neutral value.
void TintControl::applyParameter(const char* text) {
    ColorParameters p;
    p.setTint(VCOption_ParseStringI(text, "intensity", 0));
    setParameters(p);
}
