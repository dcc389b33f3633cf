#include "core/filters/sce/fixedLooks.h"

const char* Sepia::getFragmentShader() const {
    return "vec4 doEffect() { vec4 color = texture2D(texSampler, v_texcoord); "
           "float r = min(dot(vec3(0.393, 0.769, 0.189), color.rgb), 1.0); "
           "float g = min(dot(vec3(0.349, 0.686, 0.168), color.rgb), 1.0); "
           "float b = min(dot(vec3(0.272, 0.536, 0.131), color.rgb), 1.0); "
           "color.rgb = vec3(r, g, b); return color; }";
}
