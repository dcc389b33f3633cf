// The bare GL side of the benchmarks that compare the library with the same
// GL work done directly: a program over the quad vertex shader, compiled as
// the platform compiles the library's shaders, and one draw of the quad.
#ifndef KIV_BENCH_BENCH_GL_H
#define KIV_BENCH_BENCH_GL_H

#include <GLES2/gl2.h>

#include <string>

#include "core/egl/EglNativeSeam.h"
#include "core/egl/EglShader.h"

namespace kivbench {

// The quad's vertex shader with `fragment`, attributes 0 (a_position) and 1
// (a_texcoord); 0 when it does not link.
inline GLuint quadProgram(const char* fragment) {
    auto shader = [](GLenum type, const char* text) {
        std::string adapted;
        text = EglNativeSeam::get().shaderText(type, text, &adapted);
        GLuint s = glCreateShader(type);
        glShaderSource(s, 1, &text, nullptr);
        glCompileShader(s);
        return s;
    };
    GLuint program = glCreateProgram();
    GLuint vs = shader(GL_VERTEX_SHADER, EglShader::kVertexShader);
    GLuint fs = shader(GL_FRAGMENT_SHADER, fragment);
    glAttachShader(program, vs);
    glAttachShader(program, fs);
    glBindAttribLocation(program, 0, "a_position");
    glBindAttribLocation(program, 1, "a_texcoord");
    glLinkProgram(program);
    glDeleteShader(vs);
    glDeleteShader(fs);
    GLint linked = 0;
    glGetProgramiv(program, GL_LINK_STATUS, &linked);
    if (linked) return program;
    glDeleteProgram(program);
    return 0;
}

// The quad over a width x height viewport, texSampler on unit 0, texture
// coordinates `uv` for the strip's four corners.
inline void drawQuad(GLuint program, int width, int height, const GLfloat uv[8]) {
    static const GLfloat quad[] = {-1, -1, 0, 1, -1, 0, -1, 1, 0, 1, 1, 0};
    glViewport(0, 0, width, height);
    glUseProgram(program);
    glUniform1i(glGetUniformLocation(program, "texSampler"), 0);
    glVertexAttribPointer(0, 3, GL_FLOAT, GL_FALSE, 0, quad);
    glVertexAttribPointer(1, 2, GL_FLOAT, GL_FALSE, 0, uv);
    glEnableVertexAttribArray(0);
    glEnableVertexAttribArray(1);
    glDrawArrays(GL_TRIANGLE_STRIP, 0, 4);
}

}  // namespace kivbench

#endif
