#include "core/filters/sce/colorEffects.h"

#define VC_SOURCE "core/filters/sce/highlightShadow"

const char HighlightShadow::kEffectName[] = "HighlightShadow";
const char* const HighlightShadow::kParameterKeys[] = {"highlight", "shadow", nullptr};

HighlightShadow::HighlightShadow() : KivParameterOption(COLOR_LEVELS) {}

int HighlightShadow::loadPartialFragmentShader(EglProgram& program, const char*,
                                               unsigned int& shaderId) {
    return loadFullShader(program, shaderId, VC_SOURCE, __LINE__);
}

int HighlightShadow::onDrawFrame(EglProgram& program) {
    return drawFullShader(program, nullptr, VC_SOURCE, __LINE__);
}

// A key that is absent or unreadable gives the neutral value.
void HighlightShadow::applyParameter(const char* text) {
    ColorParameters p;
    p.setLevels(VCOption_ParseStringI(text, "highlight", 0),
                VCOption_ParseStringI(text, "shadow", 0));
    setParameters(p);
}
