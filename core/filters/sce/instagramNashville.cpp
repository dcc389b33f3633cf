#include "core/filters/sce/fixedLooks.h"

const char* InstagramNashville::getFragmentShader() const {
    return "vec4 doEffect() { vec4 color = texture2D(texSampler, v_texcoord); vec4 color_Nash; "
           "color_Nash.rgba = vec4(0.26, 0.38, 0.68, 1.0); color = 0.7 * color + 0.3 * color_Nash; "
           "return color; }";
}
