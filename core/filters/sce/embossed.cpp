#include <GLES2/gl2.h>

#include <algorithm>
#include <cmath>

#include "core/egl/EglCheck.h"
#include "core/egl/EglProgram.h"
#include "core/filters/sce/geometricEffects.h"

#define VC_SOURCE "core/filters/sce/embossed"

// The kernel is lopsided on purpose: the third neighbour steps by stepsize.x
// along y, and the weight of -8 falls on the neighbour below, not the pixel.
const char* Embossed::getFragmentShader() const {
    return "uniform float u_step_x; uniform float u_step_y; vec4 doEffect() { vec4 color = "
           "texture2D(texSampler, v_texcoord); vec2 stepsize = vec2(u_step_x, u_step_y); vec3 "
           "nbr_color[9]; nbr_color[0] = texture2D(texSampler, v_texcoord - stepsize).rgb; "
           "nbr_color[1] = texture2D(texSampler, vec2(v_texcoord.x - stepsize.x, "
           "v_texcoord.y)).rgb; nbr_color[2] = texture2D(texSampler, vec2(v_texcoord.x - "
           "stepsize.x, v_texcoord.y + stepsize.x)).rgb; nbr_color[3] = texture2D(texSampler, "
           "vec2(v_texcoord.x, v_texcoord.y - stepsize.y)).rgb; nbr_color[4] = "
           "texture2D(texSampler, vec2(v_texcoord.x, v_texcoord.y + stepsize.y)).rgb; "
           "nbr_color[5] = color.rgb; nbr_color[6] = texture2D(texSampler, vec2(v_texcoord.x + "
           "stepsize.x, v_texcoord.y - stepsize.y)).rgb; nbr_color[7] = texture2D(texSampler, "
           "vec2(v_texcoord.x + stepsize.x, v_texcoord.y)).rgb; nbr_color[8] = "
           "texture2D(texSampler, vec2(v_texcoord.x + stepsize.x, v_texcoord.y + "
           "stepsize.y)).rgb; vec3 edge_color = vec3(1.0 - (nbr_color[0] + nbr_color[1] + "
           "nbr_color[2] + nbr_color[3] + nbr_color[5] + nbr_color[6] + nbr_color[7] + "
           "nbr_color[8] - 8.0 * nbr_color[4])); float max_rgb = max(max(edge_color.r, "
           "edge_color.g), edge_color.b); float comp_factor = step(max_rgb, 0.2); max_rgb = "
           "mix(max_rgb, 0.3, comp_factor); max_rgb = max_rgb * max_rgb; float color_factor = "
           "1.0 / (1.0 + 0.25 / max_rgb) + 0.1; return vec4(color_factor, color_factor, "
           "color_factor, 1.0); }";
}

int Embossed::onDrawFrame(EglProgram& program) {
    GLint stepxHandle = -1, stepyHandle = -1;
    GL_CHECK(stepxHandle = glGetUniformLocation(program.getProgramID(), "u_step_x"));
    GL_CHECK(stepyHandle = glGetUniformLocation(program.getProgramID(), "u_step_y"));
    float step = 1.0f / std::max(program.getCameraWidth(), 1);
    GL_CHECK(glUniform1f(stepxHandle, step));
    step = 1.0f / std::max(program.getCameraHeight(), 1);
    GL_CHECK(glUniform1f(stepyHandle, step));
    return 0;
}

KivPixelReach Embossed::pixelReach(int width, int height) const {
    int sideways = static_cast<int>(std::ceil(static_cast<double>(height) / std::max(width, 1)));
    return {KivPixelReach::NEIGHBOURS, std::max(1, sideways + 1), 1 + 1};
}
