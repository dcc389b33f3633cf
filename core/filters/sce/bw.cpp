#include "core/filters/sce/fixedLooks.h"

const char* BW::getFragmentShader() const {
    return "vec4 doEffect() { vec4 color = texture2D(texSampler, v_texcoord); "
           "float gray = (color.r + color.g + color.b) / 3.0; "
           "if (gray < 0.3 || gray > 0.8) gray = 0.0; else gray = 1.0; "
           "return vec4(gray, gray, gray, 1.0); }";
}
