#include "core/filters/sce/colorEffects.h"

#define VC_SOURCE "core/filters/sce/colorPresets"

// The presets' levels are used as they are: an input level of 0.5 doubles the
// contrast of the levels step, and that is part of each look.
namespace {

ColorParameters preset(float temperature, float temperaturePositive, float contrast, float saturate,
                       float tintR, float tintG, float tintB, float outputShadow, float inputLevel,
                       float outputLevel) {
    ColorParameters p;
    p.temperature = temperature;
    p.temperaturePositive = temperaturePositive;
    p.contrast = contrast;
    p.saturate = saturate;
    p.tintColor[0] = tintR;
    p.tintColor[1] = tintG;
    p.tintColor[2] = tintB;
    p.inputShadow = 0.0f;
    p.outputShadow = outputShadow;
    p.inputLevel = inputLevel;
    p.outputLevel = outputLevel;
    return p;
}

}  // namespace

int ColorPreset::loadPartialFragmentShader(EglProgram& program, const char*,
                                           unsigned int& shaderId) {
    return loadFullShader(program, shaderId, VC_SOURCE, __LINE__);
}

int ColorPreset::onDrawFrame(EglProgram& program) {
    return drawFullShader(program, nullptr, VC_SOURCE, __LINE__);
}

Breezy::Breezy() : ColorPreset(COLOR_ALL_ADJUSTMENTS) {
    initParameter();
}

void Breezy::initParameter() {
    setParameters(preset(0.1f, 0.025f, 1.05f, 0.2f, 0.015f, 0.0f, 0.015f, 0.075f, 0.5f, 0.4875f));
}

Nostalgic::Nostalgic() : ColorPreset(COLOR_ALL_ADJUSTMENTS) {
    initParameter();
}

void Nostalgic::initParameter() {
    setParameters(preset(0.2f, 0.05f, 0.9f, -0.5f, 0.09f, 0.0f, 0.09f, -0.0f, 0.5375f, 0.5f));
}

Soft::Soft() : ColorPreset(COLOR_ALL_ADJUSTMENTS) {
    initParameter();
}

void Soft::initParameter() {
    setParameters(preset(0.1f, 0.025f, 0.85f, -0.1f, 0.06f, 0.0f, 0.06f, -0.0f, 0.5f, 0.55f));
}

Serene::Serene() : ColorPreset(COLOR_TINT | COLOR_SATURATE | COLOR_CONTRAST | COLOR_LEVELS) {
    initParameter();
}

// No temperature step in this look.
void Serene::initParameter() {
    setParameters(preset(0.0f, 0.0f, 1.15f, 0.15f, 0.0f, 0.045f, 0.0f, 0.0125f, 0.5125f, 0.4875f));
}

Vivid::Vivid() : ColorPreset(COLOR_SATURATE | COLOR_TEMPERATURE | COLOR_CONTRAST | COLOR_LEVELS) {
    initParameter();
}

// No tint step in this look.
void Vivid::initParameter() {
    setParameters(preset(-0.15f, 0.0f, 1.1f, 0.25f, 0.0f, 0.0f, 0.0f, -0.0f, 0.5f, 0.525f));
}
