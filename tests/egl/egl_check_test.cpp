// The checked-call macros against real GL/EGL errors, and the name table.
#include <EGL/egl.h>
#include <GLES2/gl2.h>
#include <gtest/gtest.h>

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
    const char* gl[] = {
        "GL_NO_ERROR", "GL_INVALID_ENUM", "GL_INVALID_VALUE", "GL_INVALID_OPERATION",
        nullptr,       nullptr,           "GL_OUT_OF_MEMORY", "GL_INVALID_FRAMEBUFFER_OPERATION"};
    const char* egl[] = {"EGL_SUCCESS",       "EGL_NOT_INITIALIZED",     "EGL_BAD_ACCESS",
                         "EGL_BAD_ALLOC",     "EGL_BAD_ATTRIBUTE",       "EGL_BAD_CONFIG",
                         "EGL_BAD_CONTEXT",   "EGL_BAD_CURRENT_SURFACE", "EGL_BAD_DISPLAY",
                         "EGL_BAD_MATCH",     "EGL_BAD_NATIVE_PIXMAP",   "EGL_BAD_NATIVE_WINDOW",
                         "EGL_BAD_PARAMETER", "EGL_BAD_SURFACE",         "EGL_CONTEXT_LOST"};
    // 0 and 0x0500..0x0506 minus the desktop-only stack errors; 0x3000..0x300E.
    int named = 0;
    for (int code = -1; code < 0x4000; code++) {
        const char* want = nullptr;
        if (code == 0) want = gl[0];
        if (code >= 0x0500 && code <= 0x0506) want = gl[code - 0x04FF];
        if (code >= 0x3000 && code <= 0x300E) want = egl[code - 0x3000];
        const char* name = EglErrorName(code);
        named += name != nullptr;
        if (want == nullptr) {
            EXPECT_EQ(name, nullptr) << std::hex << code;
        } else {
            EXPECT_STREQ(name, want) << std::hex << code;
        }
    }
    EXPECT_EQ(named, 21);
}

TEST_F(GlContextTest, GlCheckLogsTheStatementAsWritten) {
    LogCapture log;
    EXPECT_TRUE(GL_CHECK(glBindTexture(GL_TEXTURE_2D, 0)));
    EXPECT_TRUE(log.lines().empty());

    int line = __LINE__ + 1;
    EXPECT_FALSE(GL_CHECK(glBindTexture(0x1234, 0)));
    ASSERT_EQ(log.lines().size(), 1u);
    EXPECT_EQ(log.lines()[0].level, VF_LOG_ERROR);
    EXPECT_EQ(log.lines()[0].text,
              "GL Error: 0x0500 'GL_INVALID_ENUM' - glBindTexture(0x1234, 0)" + at(line));
    EXPECT_EQ(glGetError(), static_cast<GLenum>(GL_NO_ERROR));  // consumed

    // A statement broken over lines logs as written on one line.
    log.clear();
    // clang-format off
    EXPECT_FALSE(GL_CHECK(glBindTexture(
        0x1234,
        0)));
    // clang-format on
    ASSERT_EQ(log.lines().size(), 1u);
    EXPECT_EQ(
        log.lines()[0].text.rfind("GL Error: 0x0500 'GL_INVALID_ENUM' - glBindTexture(0x1234, "
                                  "0) at tests/egl/egl_check_test:",
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
    // A false result without a raised error still fails.
    EGLBoolean fakeFalse = EGL_FALSE;
    int line2 = __LINE__ + 1;
    EXPECT_FALSE(EGL_CHECK_BOOL(fakeFalse));
    EGLSurface surface = EGL_NO_SURFACE;
    int line3 = __LINE__ + 1;
    EXPECT_FALSE(EGL_CHECK(surface = eglGetCurrentSurface(0x1234)));
    EXPECT_EQ(log.texts(),
              (std::vector<std::string>{
                  "EGL Error: 0x3008 'EGL_BAD_DISPLAY' - result = eglMakeCurrent(nullptr, "
                  "EGL_NO_SURFACE, EGL_NO_SURFACE, EGL_NO_CONTEXT)" +
                      at(line),
                  "EGL Error: 0x3000 'EGL_SUCCESS' - fakeFalse" + at(line2),
                  "EGL Error: 0x300c 'EGL_BAD_PARAMETER' - surface = eglGetCurrentSurface(0x1234)" +
                      at(line3)}));

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
    EXPECT_EQ(log.texts(),
              std::vector<std::string>{"GL Clearing error: 0x0500 'GL_INVALID_ENUM'" + at(line)});
}

}  // namespace
