#include "core/filters/sce/fixedLooks.h"

const char* FadedColor::getFragmentShader() const {
    return "vec4 doEffect() { vec4 color = texture2D(texSampler, v_texcoord); "
           "float s32Step = 64.0; float r = color.r; float g = color.g; float b = color.b; "
           "float temp = 0.00351 * s32Step; temp = 1.0 - temp; r = r * temp; "
           "temp = 0.8125 * s32Step; temp = temp / 256.0; r = r + temp; temp = 0.002075 * s32Step; "
           "temp = 1.0 - temp; g = g * temp; temp = 0.40625 * s32Step; temp = temp / 256.0; "
           "g = g + temp; temp = 0.004547 * s32Step; temp = 1.0 - temp; b = b * temp; "
           "temp = 0.5625 * s32Step; temp = temp / 256.0; b = b + temp; "
           "return vec4(vec3(r, g, b), 1.0); }";
}
