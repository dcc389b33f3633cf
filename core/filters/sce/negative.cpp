#include "core/filters/sce/fixedLooks.h"

const char* Negative::getFragmentShader() const {
    return "vec4 doEffect() { vec4 color = texture2D(texSampler, v_texcoord); "
           "color.rgb = 1.0 - color.rgb; return color; }";
}
