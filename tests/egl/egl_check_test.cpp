// The checked-call macros against real GL/EGL errors, and the name table.
#include <EGL/egl.h>
#include <GLES2/gl2.h>
#include <gtest/gtest.h>

#include <string>

#include "core/egl/EglCheck.h"
#include "support/gl_context.h"
#include "support/log_capture.h"

#define VC_SOURCE "tests/egl/egl_check_test"

namespace {

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
    for (int code = -1; code < 0x4000; code++) {
        const char* want = code == 0 ? gl[0] : nullptr;
        if (code >= 0x0500 && code <= 0x0506) want = gl[code - 0x04FF];
        if (code >= 0x3000 && code <= 0x300E) want = egl[code - 0x3000];
        EXPECT_EQ(want ? want : "(none)",
                  std::string(EglErrorName(code) ? EglErrorName(code) : "(none)"))
            << std::hex << code;
    }
}

// A failed call logs its error, its name and the statement as written (on one
// line however it was broken) with where it was; a false EGL result without an
// error fails too; clearing drains both APIs' pending errors and counts them.
TEST_F(GlContextTest, ChecksLogCodeNameAndStatement) {
    LogCapture log;
    EXPECT_TRUE(GL_CHECK(glBindTexture(GL_TEXTURE_2D, 0)));
    EXPECT_EQ(EGL_GL_CLEAR_ERRORS(), 0);
    EXPECT_TRUE(log.lines().empty());
    GLuint name = 0;
    EGLBoolean result, fakeFalse = EGL_FALSE;
    EGLSurface surface = EGL_NO_SURFACE;
    const int line = __LINE__ + 1;
    EXPECT_FALSE(GL_CHECK(glBindTexture(0x1234, 0)));
    EXPECT_EQ(glGetError(), static_cast<GLenum>(GL_NO_ERROR));  // consumed
    EXPECT_FALSE(GL_CHECK(name = glCreateShader(GL_TEXTURE_2D)));
    // clang-format off
    EXPECT_FALSE(GL_CHECK(glBindTexture(
        0x1234,
        0)));
    // clang-format on
    EXPECT_EQ(name, 0u);
    EXPECT_FALSE(EGL_CHECK_BOOL(
        result = eglMakeCurrent(nullptr, EGL_NO_SURFACE, EGL_NO_SURFACE, EGL_NO_CONTEXT)));
    EXPECT_EQ(result, static_cast<EGLBoolean>(EGL_FALSE));
    EXPECT_FALSE(EGL_CHECK_BOOL(fakeFalse));
    EXPECT_FALSE(EGL_CHECK(surface = eglGetCurrentSurface(0x1234)));
    glBindTexture(0x1234, 0);
    eglMakeCurrent(nullptr, EGL_NO_SURFACE, EGL_NO_SURFACE, EGL_NO_CONTEXT);
    EXPECT_EQ(EGL_GL_CLEAR_ERRORS(), 2);
    glBindTexture(0x1234, 0);
    EXPECT_EQ(GL_CLEAR_ERRORS(), 1);
    EXPECT_EQ(EGL_CLEAR_ERRORS(), 0);
    EXPECT_EQ(glGetError(), static_cast<GLenum>(GL_NO_ERROR));
    EXPECT_EQ(eglGetError(), EGL_SUCCESS);
    const std::string at = " at tests/egl/egl_check_test:";
    EXPECT_TRUE(log.matches(std::vector<std::string>{
        "E GL Error: 0x0500 'GL_INVALID_ENUM' - glBindTexture(0x1234, 0)" + at +
            std::to_string(line),
        "E GL Error: 0x0500 'GL_INVALID_ENUM' - name = glCreateShader(GL_TEXTURE_2D)" + at + "#",
        "E GL Error: 0x0500 'GL_INVALID_ENUM' - glBindTexture(0x1234, 0)" + at + "#",
        "E EGL Error: 0x3008 'EGL_BAD_DISPLAY' - result = eglMakeCurrent(nullptr, EGL_NO_SURFACE, "
        "EGL_NO_SURFACE, EGL_NO_CONTEXT)" +
            at + "#",
        "E EGL Error: 0x3000 'EGL_SUCCESS' - fakeFalse" + at + "#",
        "E EGL Error: 0x300c 'EGL_BAD_PARAMETER' - surface = eglGetCurrentSurface(0x1234)" + at +
            "#",
        "E EGL Clearing error: 0x3008 'EGL_BAD_DISPLAY'" + at + "#",
        "E GL Clearing error: 0x0500 'GL_INVALID_ENUM'" + at + "#",
        "E GL Clearing error: 0x0500 'GL_INVALID_ENUM'" + at + "#"}));
    EXPECT_TRUE(EGL_CHECK(surface = eglGetCurrentSurface(EGL_DRAW)));
    EXPECT_NE(surface, EGL_NO_SURFACE);
}

}  // namespace
