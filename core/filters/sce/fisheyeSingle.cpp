#include <GLES2/gl2.h>

#include <algorithm>

#include "core/egl/EglCheck.h"
#include "core/egl/EglProgram.h"
#include "core/filters/sce/geometricEffects.h"

#define VC_SOURCE "core/filters/sce/fisheyeSingle"

const char* FisheyeSingle::getFragmentShader() const {
    return "const vec2 center = vec2(0.5, 0.5); uniform float aspectRatio; vec4 doEffect() { "
           "float factor = 4.5; float scale = 0.45; highp vec2 mod_xy = v_texcoord; mod_xy.x = "
           "(v_texcoord.x - ((1.0 - aspectRatio) / 2.0)) / aspectRatio; highp vec2 norm_xy = "
           "vec2(mod_xy - center); highp float dist = distance(mod_xy, center) + 0.0001; highp "
           "float dist1 = dist + factor * (1.0 - sqrt((1.0 - dist * dist))); highp vec2 "
           "mod_norm_xy = vec2(dist1 * (norm_xy.x / dist), dist1 * (norm_xy.y / dist)); highp "
           "vec2 lens_xy = mod_norm_xy * scale + center; lens_xy.x = lens_xy.x * aspectRatio + "
           "((1.0 - aspectRatio) / 2.0); vec4 color = texture2D(texSampler, lens_xy); factor = "
           "0.5; mod_xy.x = factor * (v_texcoord.x - center.x) / aspectRatio; mod_xy.y = factor "
           "* (v_texcoord.y - center.y); dist = length(mod_xy); color.rgb = color.rgb * "
           "step(dist, 0.25); return color; }";
}

int FisheyeSingle::onDrawFrame(EglProgram& program) {
    GLint aspectRatioHandle = -1;
    GL_CHECK(aspectRatioHandle = glGetUniformLocation(program.getProgramID(), "aspectRatio"));
    float ratio = static_cast<float>(program.getCameraHeight()) /
                  static_cast<float>(std::max(program.getCameraWidth(), 1));
    GL_CHECK(glUniform1f(aspectRatioHandle, ratio));
    return 0;
}
