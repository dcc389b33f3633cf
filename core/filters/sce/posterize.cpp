#include "core/filters/sce/fixedLooks.h"

const char* Posterize::getFragmentShader() const {
    return "vec4 doEffect() { vec4 color = texture2D(texSampler, v_texcoord); "
           "vec3 pcolor1 = floor(vec3(color.rgb * 4.0)); vec3 pcolor2 = vec3(pcolor1 / 3.0); "
           "return vec4(pcolor2, 1.0); }";
}
