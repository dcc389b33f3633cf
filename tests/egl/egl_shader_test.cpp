// EglShader on real GL: building and linking, compile failures, the name
// index and its setters, replacing a stage, and release leaving no GL object.
#include <GLES2/gl2.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "core/egl/EglShader.h"
#include "support/gl_context.h"
#include "support/log_capture.h"

using android::sp;

namespace {

const char kSolidFragment[] =
    "precision mediump float; uniform vec3 u_color; uniform float u_alpha; varying highp vec2 "
    "v_texcoord; void main() { gl_FragColor = vec4(u_color, u_alpha); }";
const float kQuad[12] = {-1, -1, 0, 1, -1, 0, -1, 1, 0, 1, 1, 0};

TEST_F(GlContextTest, ShaderBuildsLinksAndDrawsThroughItsIndex) {
    sp<EglShader> shader = new EglShader();
    // No program yet: the index stays empty.
    EXPECT_EQ(shader->addNameIndexer("u_color", EglShader::INDEX_UNIFORM, 0), 0);
    EXPECT_EQ(shader->getNameIndexer("u_color"), nullptr);
    ASSERT_EQ(shader->initialize(true), 0);
    const GLuint program = shader->getProgramId(), vertex = shader->getVertexId();
    ASSERT_TRUE(glIsProgram(program) && glIsShader(vertex));
    unsigned int fragment = shader->loadShader(GL_FRAGMENT_SHADER, kSolidFragment);
    ASSERT_NE(fragment, 0u);
    ASSERT_EQ(shader->bindFragmentShader(fragment, true), 0);
    GLint linked = 0;
    glGetProgramiv(program, GL_LINK_STATUS, &linked);
    EXPECT_EQ(linked, GL_TRUE);
    ASSERT_EQ(shader->bindProgram(EglShader::SHADER_PRECISION_MEDIUM), 0);
    EXPECT_EQ(shader->addNameIndexer("a_position", EglShader::INDEX_ATTRIBUTE, 206), 1);
    for (const char* name : {"u_color", "u_alpha", "u_missing"})
        EXPECT_EQ(shader->addNameIndexer(name, EglShader::INDEX_UNIFORM, 0), 1) << name;
    const EglShader::NameIndex* pos = shader->getNameIndexer("a_position");
    ASSERT_NE(pos, nullptr);
    EXPECT_EQ(pos->mKind, EglShader::INDEX_ATTRIBUTE);
    EXPECT_EQ(pos->mType, 206);
    EXPECT_EQ(pos->mHandle, glGetAttribLocation(program, "a_position"));
    EXPECT_EQ(shader->getNameIndexer("u_missing")->mHandle, -1);

    GlTarget target;
    ASSERT_TRUE(GlTest_makeTarget(2, 2, &target));
    glViewport(0, 0, 2, 2);
    LogCapture log;
    const float color[3] = {1.0f, 0.0f, 1.0f}, zero = 0.0f;
    shader->setUniformfv("u_color", 3, 1, color);
    shader->setUniformf("u_alpha", 1.0f);
    // Ignored without a GL call: unknown name, location -1, wrong kind.
    shader->setUniformf("u_nothing", 0.5f);
    shader->setUniformf("u_missing", 0.5f);
    shader->setUniformf("a_position", 0.5f);
    shader->bindVertexAttrib("u_alpha", 3, kQuad);
    shader->bindVertexAttrib("a_position", 3, kQuad);
    glDrawArrays(GL_TRIANGLE_STRIP, 0, 4);
    shader->unBindVertexAttrib("a_position");
    EXPECT_TRUE(log.lines().empty());
    EXPECT_EQ(glGetError(), static_cast<GLenum>(GL_NO_ERROR));
    std::vector<uint8_t> magenta;
    for (int i = 0; i < 4; i++) magenta.insert(magenta.end(), {255, 0, 255, 255});
    EXPECT_EQ(GlTest_readPixels(2, 2), magenta);
    // Alpha through the 1-component vector setter.
    shader->setUniformfv("u_alpha", 1, 1, &zero);
    shader->bindVertexAttrib("a_position", 3, kQuad);
    glDrawArrays(GL_TRIANGLE_STRIP, 0, 4);
    EXPECT_EQ(GlTest_readPixels(1, 1)[3], 0);
    shader->clearIndexer();
    EXPECT_EQ(shader->getNameIndexer("a_position"), nullptr);
    GlTest_deleteTarget(&target);
    shader->unbindProgram();
    shader->release();
    shader->release();  // the second call must be harmless
    EXPECT_EQ(shader->getProgramId(), 0u);
    EXPECT_FALSE(glIsProgram(program) || glIsShader(vertex) || glIsShader(fragment));
}

TEST_F(GlContextTest, CompileAndLinkFailuresAreReported) {
    sp<EglShader> shader = new EglShader();
    ASSERT_EQ(shader->initialize(true), 0);
    LogCapture log;
    const char* broken = "void main() { gl_FragColor = nonsense; }";
    EXPECT_EQ(shader->loadShader(GL_FRAGMENT_SHADER, broken), 0u);
    EXPECT_EQ(shader->loadShader(0x1234, "void main() {}"), 0u);
    // The fragment stage reads the vertex stage's varying with another type.
    unsigned int fragment = shader->loadShader(
        GL_FRAGMENT_SHADER,
        "precision mediump float; varying highp vec3 v_texcoord; void main() { gl_FragColor = "
        "vec4(v_texcoord, 1.0); }");
    ASSERT_NE(fragment, 0u);
    EXPECT_EQ(shader->bindFragmentShader(fragment, true), -1);
    EXPECT_TRUE(log.contains(VF_LOG_ERROR, std::string("Failed to compile shader: ") + broken));
    EXPECT_TRUE(log.contains("Failed to create a shader of type 0x1234 (GL_VERTEX_SHADER)"));
    EXPECT_TRUE(log.contains(VF_LOG_ERROR, "GL Error: Program failed to link."));
    shader->release();
    EXPECT_FALSE(glIsShader(fragment));
}

TEST_F(GlContextTest, ReplacingAStageDeletesTheOldShader) {
    sp<EglShader> shader = new EglShader();
    ASSERT_EQ(shader->initialize(false), 0);
    unsigned int first = shader->loadShader(GL_FRAGMENT_SHADER, kSolidFragment);
    ASSERT_EQ(shader->bindFragmentShader(first, true), 0);
    unsigned int second = shader->loadShader(GL_FRAGMENT_SHADER, kSolidFragment);
    ASSERT_EQ(shader->bindFragmentShader(second, true), 0);
    EXPECT_FALSE(glIsShader(first));
    EXPECT_EQ(shader->getFragmentId(), second);
    GLint attached = 0;
    glGetProgramiv(shader->getProgramId(), GL_ATTACHED_SHADERS, &attached);
    EXPECT_EQ(attached, 2);
    shader->unBindFragmentShader();
    EXPECT_FALSE(glIsShader(second));
    EXPECT_EQ(shader->getFragmentId(), 0u);
    glGetProgramiv(shader->getProgramId(), GL_ATTACHED_SHADERS, &attached);
    EXPECT_EQ(attached, 1);
    shader->release();
}

}  // namespace
