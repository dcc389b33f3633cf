#include <GLES2/gl2.h>

#include <algorithm>
#include <cmath>

#include "core/egl/EglCheck.h"
#include "core/egl/EglProgram.h"
#include "core/filters/sce/geometricEffects.h"

#define VC_SOURCE "core/filters/sce/mosaic"

const char* Mosaic::getFragmentShader() const {
    return "uniform float u_step; vec4 doEffect() { vec2 texcoord = vec2(u_step * "
           "floor(v_texcoord.x / u_step), u_step * floor(v_texcoord.y / u_step)); return "
           "texture2D(texSampler, texcoord); }";
}

int Mosaic::onDrawFrame(EglProgram& program) {
    GLint stepHandle = -1;
    GL_CHECK(stepHandle = glGetUniformLocation(program.getProgramID(), "u_step"));
    // 32 camera pixels across; a camera size never set counts as one pixel.
    float step = 1.0f / std::max(program.getCameraWidth(), 1) * 32.0f;
    GL_CHECK(glUniform1f(stepHandle, step));
    return 0;
}

KivPixelReach Mosaic::pixelReach(int width, int height) const {
    int cellRows = static_cast<int>(std::ceil(32.0 * height / std::max(width, 1)));
    return {KivPixelReach::NEIGHBOURS, cellRows + 1, 32 + 1};
}
