// The checked-call macros against real GL/EGL errors, and the name table.
#include <EGL/egl.h>
#include <GLES2/gl2.h>
#include <gtest/gtest.h>
#include <stdio.h>

#include <string>

#include "core/egl/EglCheck.h"
#include "support/gl_context.h"
#include "support/log_capture.h"
#include "vccore/vc_log.h"

#define VC_SOURCE "tests/egl/egl_check_test"

namespace {

std::string at(int line) {
    return " at tests/egl/egl_check_test:" + std::to_string(line);
}

TEST(EglCheckTest, NameTableCoversBothApisAndNothingElse) {
    const struct {
        int code;
        const char* name;
    } expected[] = {
        {0x0000, "GL_NO_ERROR"},           {0x0500, "GL_INVALID_ENUM"},
        {0x0501, "GL_INVALID_VALUE"},      {0x0502, "GL_INVALID_OPERATION"},
        {0x0505, "GL_OUT_OF_MEMORY"},      {0x0506, "GL_INVALID_FRAMEBUFFER_OPERATION"},
        {0x3000, "EGL_SUCCESS"},           {0x3001, "EGL_NOT_INITIALIZED"},
        {0x3002, "EGL_BAD_ACCESS"},        {0x3003, "EGL_BAD_ALLOC"},
        {0x3004, "EGL_BAD_ATTRIBUTE"},     {0x3005, "EGL_BAD_CONFIG"},
        {0x3006, "EGL_BAD_CONTEXT"},       {0x3007, "EGL_BAD_CURRENT_SURFACE"},
        {0x3008, "EGL_BAD_DISPLAY"},       {0x3009, "EGL_BAD_MATCH"},
        {0x300A, "EGL_BAD_NATIVE_PIXMAP"}, {0x300B, "EGL_BAD_NATIVE_WINDOW"},
        {0x300C, "EGL_BAD_PARAMETER"},     {0x300D, "EGL_BAD_SURFACE"},
        {0x300E, "EGL_CONTEXT_LOST"},
    };
    int named = 0;
    for (const auto& e : expected) {
        ASSERT_NE(EglErrorName(e.code), nullptr) << std::hex << e.code;
        EXPECT_STREQ(EglErrorName(e.code), e.name);
    }
    // Nothing outside the table has a name (0x0503/0x0504 are desktop-only
    // stack errors, 0x300F is past the EGL 1.4 range).
    for (int code = 0; code < 0x4000; code++) {
        if (EglErrorName(code) != nullptr) named++;
    }
    EXPECT_EQ(named, static_cast<int>(sizeof(expected) / sizeof(expected[0])));
    EXPECT_EQ(EglErrorName(0x0503), nullptr);
    EXPECT_EQ(EglErrorName(0x300F), nullptr);
    EXPECT_EQ(EglErrorName(-1), nullptr);
}

TEST_F(GlContextTest, GlCheckLogsTheStatementAsWritten) {
    LogCapture log;
    EXPECT_TRUE(GL_CHECK(glBindTexture(GL_TEXTURE_2D, 0)));
    EXPECT_TRUE(log.lines().empty());

    int line = __LINE__ + 1;
    bool ok = GL_CHECK(glBindTexture(0x1234, 0));
    EXPECT_FALSE(ok);
    ASSERT_EQ(log.lines().size(), 1u);
    EXPECT_EQ(log.lines()[0].level, VF_LOG_ERROR);
    EXPECT_EQ(log.lines()[0].text,
              "GL Error: 0x0500 'GL_INVALID_ENUM' - glBindTexture(0x1234, 0)" + at(line));
    // The check consumed the error.
    EXPECT_EQ(glGetError(), static_cast<GLenum>(GL_NO_ERROR));

    // A statement broken over lines logs as written on one line.
    log.clear();
    // clang-format off
    EXPECT_FALSE(GL_CHECK(glBindTexture(
        0x1234,
        0)));
    // clang-format on
    ASSERT_EQ(log.lines().size(), 1u);
    EXPECT_EQ(log.lines()[0].text.rfind(
                  "GL Error: 0x0500 'GL_INVALID_ENUM' - glBindTexture(0x1234, 0) at "
                  "tests/egl/egl_check_test:",
                  0),
              0u)
        << log.lines()[0].text;

    log.clear();
    GLuint name = 0;
    line = __LINE__ + 1;
    EXPECT_FALSE(GL_CHECK(name = glCreateShader(GL_TEXTURE_2D)));
    EXPECT_EQ(name, 0u);
    ASSERT_EQ(log.lines().size(), 1u);
    EXPECT_EQ(
        log.lines()[0].text,
        "GL Error: 0x0500 'GL_INVALID_ENUM' - name = glCreateShader(GL_TEXTURE_2D)" + at(line));
}

TEST_F(GlContextTest, EglChecksLogCodeNameAndStatement) {
    LogCapture log;
    EGLBoolean result;
    int line = __LINE__ + 1;
    EXPECT_FALSE(EGL_CHECK_BOOL(
        result = eglMakeCurrent(nullptr, EGL_NO_SURFACE, EGL_NO_SURFACE, EGL_NO_CONTEXT)));
    EXPECT_EQ(result, static_cast<EGLBoolean>(EGL_FALSE));
    ASSERT_EQ(log.lines().size(), 1u);
    EXPECT_EQ(log.lines()[0].text,
              "EGL Error: 0x3008 'EGL_BAD_DISPLAY' - result = eglMakeCurrent(nullptr, "
              "EGL_NO_SURFACE, EGL_NO_SURFACE, EGL_NO_CONTEXT)" +
                  at(line));

    // A boolean call that fails without raising an error still fails.
    log.clear();
    EGLBoolean fakeFalse = EGL_FALSE;
    line = __LINE__ + 1;
    EXPECT_FALSE(EGL_CHECK_BOOL(fakeFalse));
    ASSERT_EQ(log.lines().size(), 1u);
    EXPECT_EQ(log.lines()[0].text, "EGL Error: 0x3000 'EGL_SUCCESS' - fakeFalse" + at(line));

    log.clear();
    EGLSurface surface = EGL_NO_SURFACE;
    line = __LINE__ + 1;
    EXPECT_FALSE(EGL_CHECK(surface = eglGetCurrentSurface(0x1234)));
    ASSERT_EQ(log.lines().size(), 1u);
    EXPECT_EQ(log.lines()[0].text,
              "EGL Error: 0x300c 'EGL_BAD_PARAMETER' - surface = eglGetCurrentSurface(0x1234)" +
                  at(line));

    log.clear();
    EXPECT_TRUE(EGL_CHECK(surface = eglGetCurrentSurface(EGL_DRAW)));
    EXPECT_NE(surface, EGL_NO_SURFACE);
    EXPECT_TRUE(log.lines().empty());
}

TEST_F(GlContextTest, ClearingDrainsPendingErrorsWithoutFailing) {
    LogCapture log;
    EXPECT_EQ(EGL_GL_CLEAR_ERRORS(), 0);
    EXPECT_TRUE(log.lines().empty());

    glBindTexture(0x1234, 0);
    eglMakeCurrent(nullptr, EGL_NO_SURFACE, EGL_NO_SURFACE, EGL_NO_CONTEXT);
    int line = __LINE__ + 1;
    EXPECT_EQ(EGL_GL_CLEAR_ERRORS(), 2);
    ASSERT_EQ(log.lines().size(), 2u);
    EXPECT_EQ(log.lines()[0].text, "EGL Clearing error: 0x3008 'EGL_BAD_DISPLAY'" + at(line));
    EXPECT_EQ(log.lines()[1].text, "GL Clearing error: 0x0500 'GL_INVALID_ENUM'" + at(line));
    EXPECT_EQ(log.lines()[1].level, VF_LOG_ERROR);
    EXPECT_EQ(glGetError(), static_cast<GLenum>(GL_NO_ERROR));
    EXPECT_EQ(eglGetError(), EGL_SUCCESS);

    log.clear();
    glBindTexture(0x1234, 0);
    line = __LINE__ + 1;
    EXPECT_EQ(GL_CLEAR_ERRORS(), 1);
    EXPECT_EQ(EGL_CLEAR_ERRORS(), 0);
    ASSERT_EQ(log.lines().size(), 1u);
    EXPECT_EQ(log.lines()[0].text, "GL Clearing error: 0x0500 'GL_INVALID_ENUM'" + at(line));
}

}  // namespace
