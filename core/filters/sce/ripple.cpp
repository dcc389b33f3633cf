#include <GLES2/gl2.h>

#include <cmath>

#include "core/egl/EglCheck.h"
#include "core/egl/EglProgram.h"
#include "core/filters/sce/geometricEffects.h"

#define VC_SOURCE "core/filters/sce/ripple"

const char* Ripple::getFragmentShader() const {
    return "uniform float u_time; vec4 doEffect() { vec2 texcoord = v_texcoord * 0.96 + 0.02; "
           "vec2 postion = -1.0 + 2.0 * texcoord; float len = length(postion); texcoord = "
           "texcoord + (postion / len) * cos(len * 12.0 - u_time * 4.0) * 0.02; vec4 color = "
           "texture2D(texSampler, texcoord); return color; }";
}

int Ripple::onDrawFrame(EglProgram& program) {
    GLint timeHandle = -1;
    GL_CHECK(timeHandle = glGetUniformLocation(program.getProgramID(), "u_time"));
    // The first frame already moves: it sends 0.04.
    mTime += 0.04f;
    GL_CHECK(glUniform1f(timeHandle, mTime));
    return 0;
}

KivPixelReach Ripple::pixelReach(int width, int height) const {
    return {KivPixelReach::NEIGHBOURS, static_cast<int>(std::ceil(0.04 * height)) + 1,
            static_cast<int>(std::ceil(0.04 * width)) + 1};
}
