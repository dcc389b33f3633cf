#include "core/filters/sce/fixedLooks.h"

const char* Grayscale::getFragmentShader() const {
    return "vec4 doEffect() { vec4 color = texture2D(texSampler, v_texcoord); "
           "float y_value = dot(color.rgb, vec3(0.299, 0.587, 0.114)); "
           "color.rgb = vec3(y_value, y_value, y_value); return color; }";
}
