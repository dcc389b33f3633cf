#include "core/filters/sce/fixedLooks.h"

const char* ThermalVision::getFragmentShader() const {
    return "vec4 doEffect() { vec4 color = texture2D(texSampler, v_texcoord); vec3 color_index[3]; "
           "color_index[0] = vec3(0.0, 0.0, 1.0); color_index[1] = vec3(1.0, 1.0, 0.0); "
           "color_index[2] = vec3(1.0, 0.0, 0.0); "
           "float luminance = (color.r + color.g + color.b) / 3.0; "
           "int index = (luminance < 0.5) ? 0 : 1; "
           "return vec4(vec3(mix(color_index[index], color_index[index + 1], (luminance - "
           "float(index) * 0.5) / 0.5)), 1.0); "
           "}";
}
