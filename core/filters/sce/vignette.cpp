#include "core/filters/sce/fixedLooks.h"

const char* Vignette::getFragmentShader() const {
    return "const vec2 center = vec2(0.5, 0.5); "
           "vec4 doEffect() { vec4 color = texture2D(texSampler, v_texcoord); "
           "float dist = distance(v_texcoord.xy, center.xy); "
           "color.rgb = color.rgb * (1.0 - smoothstep(0.3, 0.7, dist)); return color; }";
}
