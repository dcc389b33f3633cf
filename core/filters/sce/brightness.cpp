#include "core/filters/sce/colorEffects.h"

#define VC_SOURCE "core/filters/sce/brightness"

const char Brightness::kEffectName[] = "Brightness";
const char* const Brightness::kParameterKeys[] = {"intensity", nullptr};

Brightness::Brightness() : KivParameterOption(COLOR_BRIGHTNESS) {}

int Brightness::loadPartialFragmentShader(EglProgram& program, const char*,
                                          unsigned int& shaderId) {
    return loadFullShader(program, shaderId, VC_SOURCE, __LINE__);
}

int Brightness::onDrawFrame(EglProgram& program) {
    return drawFullShader(program, nullptr, VC_SOURCE, __LINE__);
}

// A key that is absent or unreadable gives the neutral value.
void Brightness::applyParameter(const char* text) {
    ColorParameters p;
    p.setBrightness(VCOption_ParseStringI(text, "intensity", 0));
    setParameters(p);
}
