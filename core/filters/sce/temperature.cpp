#include "core/filters/sce/colorEffects.h"

#define VC_SOURCE "core/filters/sce/temperature"

const char Temperature::kEffectName[] = "Temperature";
const char* const Temperature::kParameterKeys[] = {"intensity", nullptr};

Temperature::Temperature() : KivParameterOption(COLOR_TEMPERATURE) {}

int Temperature::loadPartialFragmentShader(EglProgram& program, const char*,
                                           unsigned int& shaderId) {
    return loadFullShader(program, shaderId, VC_SOURCE, __LINE__);
}

int Temperature::onDrawFrame(EglProgram& program) {
    return drawFullShader(program, nullptr, VC_SOURCE, __LINE__);
}

// A key that is absent or unreadable gives the neutral value.
void Temperature::applyParameter(const char* text) {
    ColorParameters p;
    p.setTemperature(VCOption_ParseStringI(text, "intensity", 0));
    setParameters(p);
}
