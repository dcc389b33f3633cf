#include "core/filters/sce/fixedLooks.h"

const char* Rainbow::getFragmentShader() const {
    return "vec4 doEffect() { vec4 color = texture2D(texSampler, v_texcoord); "
           "vec2 center1 = vec2(0.0, 1.0); vec2 center2 = vec2(1.0, 1.0); "
           "vec2 center3 = vec2(1.0, 0.0); "
           "float dist1 = 1.0 - distance(v_texcoord.xy, center1.xy); "
           "float dist2 = 1.0 - distance(v_texcoord.xy, center2.xy); "
           "float dist3 = 1.0 - distance(v_texcoord.xy, center3.xy); "
           "vec3 rainbow_colorR = vec3(0.9, 0.2, 0.2) * dist1; "
           "vec3 rainbow_colorY = vec3(0.9, 0.9, 0.2) * dist2; "
           "vec3 rainbow_colorG = vec3(0.2, 0.2, 0.9) * dist3; "
           "color.rgb = 0.7 * color.rgb + 0.3 * rainbow_colorR.rgb + 0.2 * rainbow_colorY.rgb + "
           "0.2 * rainbow_colorG.rgb; "
           "return color; }";
}
