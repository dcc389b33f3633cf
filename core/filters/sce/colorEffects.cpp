#include "core/filters/sce/colorEffects.h"

#include <string.h>

namespace {

struct FunctionText {
    unsigned function;
    const char* uniforms;
    const char* code;
    const char* name;
};

// In the order the shaders apply them.
const FunctionText kFunctions[] = {
    {COLOR_BRIGHTNESS, "uniform float u_brightness; ",
     "vec3 brightness(vec3 color) { vec3 new_color = color * (1.0 + u_brightness); return "
     "new_color; }",
     "brightness"},
    {COLOR_TINT, "uniform vec3 u_tint_color; ",
     "vec3 tint(vec3 color) { vec3 new_color = u_tint_color * (1.0 - color) + color; return "
     "new_color; }",
     "tint"},
    {COLOR_SATURATE, "uniform float u_saturate; ",
     "vec3 benSaturate(vec3 color) { float avg_color = (color.r + color.g + color.b) * 0.333; "
     "vec3 new_color = vec3(avg_color); new_color = mix(color, new_color, -1.0 * u_saturate); "
     "return new_color; }",
     "benSaturate"},
    {COLOR_TEMPERATURE, "uniform float u_temperature; uniform float u_temperature_positive; ",
     "vec3 colorTemperature(vec3 color) { vec3 new_color = color; new_color.r = color.r + "
     "color.r * (1.0 - color.r) * u_temperature; new_color.b = color.b - color.b * (1.0 - "
     "color.b) * u_temperature; new_color.g = color.g + color.g * (1.0 - color.g) * "
     "u_temperature_positive; float max_value = max(max(new_color.r, 1.0), max(new_color.g, "
     "new_color.b)); new_color /= max_value; return new_color; }",
     "colorTemperature"},
    {COLOR_CONTRAST, "uniform float u_contrast; ",
     "vec3 contrast(vec3 color) { color -= 0.5; color *= u_contrast; color += 0.5; return "
     "color; }",
     "contrast"},
    {COLOR_LEVELS,
     "uniform float u_input_shadow; uniform float u_output_shadow; uniform float "
     "u_input_level; uniform float u_output_level; ",
     "vec3 color_level(vec3 color) { vec3 new_color = color; new_color = (new_color - "
     "u_input_shadow) / u_input_level; new_color = new_color * u_output_level + "
     "u_output_shadow; new_color = clamp(new_color, 0.0, 1.0); return new_color; }",
     "color_level"},
};

std::string assembleShader(unsigned functions) {
    std::string text =
        "#extension GL_OES_EGL_image_external : require\n"
        "precision mediump float; uniform lowp samplerExternalOES texSampler; ";
    for (const FunctionText& f : kFunctions) {
        if (functions & f.function) text += f.uniforms;
    }
    text += "varying highp vec2 v_texcoord; ";
    for (const FunctionText& f : kFunctions) {
        if (functions & f.function) text += std::string(f.code) + " ";
    }
    text += "void main() { vec3 new_color = texture2D(texSampler, v_texcoord).rgb; ";
    for (const FunctionText& f : kFunctions) {
        if (functions & f.function) text += std::string("new_color = ") + f.name + "(new_color); ";
    }
    text += "gl_FragColor = vec4(new_color, 1.0); }";
    return text;
}

}  // namespace

void ColorParameters::setBrightness(int n) {
    brightness = n / 200.0f * 0.8f;
}

void ColorParameters::setContrast(int n) {
    float c = n / 200.0f;
    // Lowering contrast goes half as far as raising it.
    contrast = c > 0.0f ? 1.0f + c : 1.0f + c * 0.5f;
}

void ColorParameters::setSaturate(int n) {
    saturate = n / 200.0f;
}

void ColorParameters::setTemperature(int n) {
    float t = n / 200.0f;
    temperature = t;
    temperaturePositive = t > 0.0f ? t * 0.25f : 0.0f;
}

void ColorParameters::setTint(int n) {
    float t = n / 200.0f * 0.3f;
    if (t > 0.0f) {
        tintColor[0] = t;  // towards magenta
        tintColor[1] = 0.0f;
        tintColor[2] = t;
    } else {
        tintColor[0] = 0.0f;  // towards green (and -0.0 at rest)
        tintColor[1] = -t;
        tintColor[2] = 0.0f;
    }
}

void ColorParameters::setLevels(int highlight, int shadow) {
    float h = highlight / 200.0f * 0.25f;
    float s = shadow / 200.0f * 0.25f;
    float in = h > 0.0f ? 0.5f : 0.5f - h;
    float out = h > 0.0f ? 0.5f + h : 0.5f;
    inputShadow = 0.0f;
    outputShadow = 0.0f;
    if (s > 0.0f) {
        inputShadow = s;
        inputLevel = in - s;
        outputLevel = out;
    } else {
        outputShadow = -s;
        inputLevel = in;
        outputLevel = out + s;
    }
}

ColorEffects::ColorEffects(unsigned functions)
    : mFunctions(functions), mShaderText(assembleShader(functions)) {
    ColorParameters& p = mParameters;
    if (functions & COLOR_BRIGHTNESS) addUniform("u_brightness", 1, &p.brightness);
    if (functions & COLOR_TINT) addUniform("u_tint_color", 3, p.tintColor);
    if (functions & COLOR_SATURATE) addUniform("u_saturate", 1, &p.saturate);
    if (functions & COLOR_TEMPERATURE) {
        addUniform("u_temperature", 1, &p.temperature);
        addUniform("u_temperature_positive", 1, &p.temperaturePositive);
    }
    if (functions & COLOR_CONTRAST) addUniform("u_contrast", 1, &p.contrast);
    if (functions & COLOR_LEVELS) {
        addUniform("u_input_shadow", 1, &p.inputShadow);
        addUniform("u_output_shadow", 1, &p.outputShadow);
        addUniform("u_input_level", 1, &p.inputLevel);
        addUniform("u_output_level", 1, &p.outputLevel);
    }
}

void ColorEffects::setParameters(const ColorParameters& parameters) {
    std::lock_guard<std::mutex> lock(parameterLock());
    mParameters = parameters;
}
