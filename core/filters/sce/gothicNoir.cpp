#include "core/filters/sce/fixedLooks.h"

const char* GothicNoir::getFragmentShader() const {
    return "const vec2 center = vec2(0.5, 0.5); "
           "vec4 doEffect() { vec4 color = texture2D(texSampler, v_texcoord); "
           "float Y = dot(color.rgb, vec3(0.299, 0.587, 0.114)); float stepsize = 0.002; "
           "float neighbor_color[3]; vec2 grad_xy; "
           "neighbor_color[0] = dot(vec3(0.299, 0.587, 0.114), texture2D(texSampler, "
           "vec2((v_texcoord.x - stepsize), (v_texcoord.y - stepsize))).rgb); "
           "neighbor_color[1] = dot(vec3(0.299, 0.587, 0.114), texture2D(texSampler, "
           "vec2(v_texcoord.x, (v_texcoord.y - stepsize))).rgb); "
           "neighbor_color[2] = dot(vec3(0.299, 0.587, 0.114), texture2D(texSampler, "
           "vec2((v_texcoord.x - stepsize), v_texcoord.y)).rgb); "
           "grad_xy.x = ((neighbor_color[0] - neighbor_color[1]) + (neighbor_color[2] - Y)) / 2.0; "
           "grad_xy.y = ((neighbor_color[0] - neighbor_color[2]) + (neighbor_color[1] - Y)) / 2.0; "
           "float edge = length(grad_xy); "
           "Y = (Y + neighbor_color[0] + neighbor_color[1] + neighbor_color[2]) / 4.0; "
           "Y = step(edge, 0.07) * min((floor(Y * 5.0)) / 5.0, 1.0); "
           "float dist = distance(v_texcoord.xy, center.xy); Y = (Y - 0.5) * 0.7 + 0.4; "
           "Y = Y * (1.0 - smoothstep(0.2, 0.9, dist)); color.rgb = vec3(Y, Y, Y); return color; }";
}
