// Shader precision on the host: where the GL's mediump float is 16-bit the
// seam compiles shaders with highp, rewriting the qualifiers only (whole
// words); the library's own texts keep their mediump (what a device compiles).
#include <GLES2/gl2.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "core/egl/EglShader.h"
#include "host/graphics/ShaderPrecision.h"
#include "support/gl_context.h"

namespace {

using android::ShaderPrecision_highp;

struct Rewrite {
    const char* in;
    const char* out;  // null: returned as it is (the same pointer)
};

TEST(ShaderPrecisionText, QualifiersBecomeHighpAsWholeWords) {
    const Rewrite table[] = {
        {"precision mediump float; void main() {}", "precision highp float; void main() {}"},
        {"precision lowp float;", "precision highp float;"},
        {"uniform lowp samplerExternalOES s; mediump vec2 t;",
         "uniform highp samplerExternalOES s; highp vec2 t;"},
        {"#extension GL_OES_EGL_image_external : require\nprecision mediump float;",
         "#extension GL_OES_EGL_image_external : require\nprecision highp float;"},
        {"mediump", "highp"},
        {"float lowpass; float mediumpx; float x_lowp; float lowp2;", nullptr},
        {"precision highp float;", nullptr},
        {"", nullptr},
    };
    for (const Rewrite& r : table) {
        std::string storage;
        const char* text = ShaderPrecision_highp(r.in, &storage);
        if (r.out == nullptr) {
            EXPECT_EQ(r.in, text) << r.in;
        } else {
            EXPECT_STREQ(r.out, text) << r.in;
        }
    }
    std::string storage;
    EXPECT_EQ(nullptr, ShaderPrecision_highp(nullptr, &storage));
}

// A value that a 16-bit float cannot hold (1 + 2^-12) comes back as 1 in
// red only when the shader computes it in single precision.
const char kProbe[] =
    "precision mediump float; uniform float u; "
    "void main() { gl_FragColor = vec4((u - 1.0) * 4096.0, 0.0, 0.0, 1.0); }";
const char kVertex[] = "attribute highp vec4 a_position; void main() { gl_Position = a_position; }";

GLuint compileRaw(GLenum type, const char* text) {
    GLuint shader = glCreateShader(type);
    glShaderSource(shader, 1, &text, nullptr);
    glCompileShader(shader);
    return shader;
}

// Red of one pixel drawn by a program of the two shaders (deleted here).
int drawRed(GLuint vertex, GLuint fragment) {
    GlTarget target;
    if (vertex == 0 || fragment == 0 || !GlTest_makeTarget(1, 1, &target)) return -1;
    GLuint program = glCreateProgram();
    glAttachShader(program, vertex);
    glAttachShader(program, fragment);
    glBindAttribLocation(program, 0, "a_position");
    glLinkProgram(program);
    glUseProgram(program);
    glUniform1f(glGetUniformLocation(program, "u"), 1.0f + 1.0f / 4096.0f);
    const float quad[] = {-1, -1, 1, -1, -1, 1, 1, 1};
    glVertexAttribPointer(0, 2, GL_FLOAT, GL_FALSE, 0, quad);
    glEnableVertexAttribArray(0);
    glViewport(0, 0, 1, 1);
    glDrawArrays(GL_TRIANGLE_STRIP, 0, 4);
    glDisableVertexAttribArray(0);
    int red = GlTest_readPixels(1, 1)[0];
    glUseProgram(0);
    glDeleteProgram(program);
    glDeleteShader(vertex);
    glDeleteShader(fragment);
    GlTest_deleteTarget(&target);
    return red;
}

class ShaderPrecisionGl : public GlContextTest {};

TEST_F(ShaderPrecisionGl, SixteenBitMediumpIsCompiledAsHighp) {
    GLint range[2], medium = 0;
    glGetShaderPrecisionFormat(GL_FRAGMENT_SHADER, GL_MEDIUM_FLOAT, range, &medium);
    android::sp<EglShader> shader = new EglShader();
    const int promoted = drawRed(shader->loadShader(GL_VERTEX_SHADER, kVertex),
                                 shader->loadShader(GL_FRAGMENT_SHADER, kProbe));
    // Whatever this GL's mediump is, the library's shaders get full precision.
    EXPECT_EQ(255, promoted);
    if (medium >= 23) GTEST_SKIP() << "this GL's mediump is single precision: nothing to promote";
    EXPECT_TRUE(android::ShaderPrecision_promotes(GL_FRAGMENT_SHADER));
    // The text as written really runs at 16 bits here.
    EXPECT_EQ(
        0, drawRed(compileRaw(GL_VERTEX_SHADER, kVertex), compileRaw(GL_FRAGMENT_SHADER, kProbe)));
}

}  // namespace
