// EglEnvironment on Mesa: the attribute lists, what initialize() builds and
// the draining of stale errors. (Repeated set-up/tear-down runs in every GL
// suite: each case makes and ends its own environment.)
#include <EGL/egl.h>
#include <GLES2/gl2.h>
#include <gtest/gtest.h>
#include <stdlib.h>

#include <string>
#include <vector>

#include "core/egl/EglEnvironment.h"
#include "core/egl/EglWindowSurface.h"
#include "support/gl_context.h"
#include "support/log_capture.h"
#include "vccore/vc_log.h"

using android::sp;

namespace {

std::vector<EGLint> list(const EGLint* attribs) {
    std::vector<EGLint> out;
    while (*attribs != EGL_NONE) out.push_back(*attribs++);
    out.push_back(EGL_NONE);
    return out;
}

TEST(EglEnvironmentTest, AttributeListsAreExact) {
    EXPECT_EQ(list(EglEnvironment::sDefaultConfigAttribs),
              (std::vector<EGLint>{0x3033, 0x0001, 0x3040, 0x0004, 0x3024, 8, 0x3023, 8, 0x3022, 8,
                                   0x3021, 8, 0x3038}));
    EXPECT_EQ(list(EglEnvironment::sDefaultContextAttribs),
              (std::vector<EGLint>{0x3098, 2, 0x3038}));
    EXPECT_EQ(list(EglEnvironment::sPbufferAttribs),
              (std::vector<EGLint>{0x3057, 1, 0x3056, 1, 0x3038}));
}

TEST(EglEnvironmentTest, InitializeBuildsAnEs2ContextOnTheDefaultConfig) {
    setenv("EGL_PLATFORM", "surfaceless", 0);
    sp<EglEnvironment> env = new EglEnvironment();
    EXPECT_FALSE(env->isInitialized());
    EXPECT_EQ(env->getEGLDisplay(), EGL_NO_DISPLAY);
    LogCapture log;
    ASSERT_EQ(env->initialize(), 0);
    EXPECT_TRUE(log.lines().empty());
    EXPECT_TRUE(env->isInitialized());
    EGLDisplay display = env->getEGLDisplay();
    EGLConfig config = env->getEGLConfig();
    ASSERT_NE(display, EGL_NO_DISPLAY);
    ASSERT_NE(config, nullptr);

    EGLint value = 0;
    EXPECT_TRUE(eglQueryContext(display, env->getEGLContext(), EGL_CONTEXT_CLIENT_VERSION, &value));
    EXPECT_EQ(value, 2);
    // The config has the alpha channel our attribute list asks for.
    EXPECT_TRUE(eglGetConfigAttrib(display, config, EGL_ALPHA_SIZE, &value));
    EXPECT_EQ(value, 8);

    EXPECT_EQ(env->release(), 0);
    // The display is terminated: its context is gone.
    EXPECT_FALSE(
        eglQueryContext(display, env->getEGLContext(), EGL_CONTEXT_CLIENT_VERSION, &value));
    EXPECT_EQ(eglGetError(), EGL_NOT_INITIALIZED);
}

TEST(EglEnvironmentTest, PendingEglAndGlErrorsAreClearedAndLoggedOnce) {
    setenv("EGL_PLATFORM", "surfaceless", 0);
    eglMakeCurrent(nullptr, EGL_NO_SURFACE, EGL_NO_SURFACE, EGL_NO_CONTEXT);  // EGL_BAD_DISPLAY
    LogCapture log;
    sp<EglEnvironment> env = new EglEnvironment();
    ASSERT_EQ(env->initialize(), 0);
    ASSERT_EQ(log.lines().size(), 1u);
    EXPECT_EQ(log.lines()[0].level, VF_LOG_ERROR);
    EXPECT_EQ(log.lines()[0].text.rfind(
                  "EGL Clearing error: 0x3008 'EGL_BAD_DISPLAY' at core/egl/EglEnvironment:", 0),
              0u)
        << log.lines()[0].text;
    env->release();

    // A GL error left pending in the current context is drained too.
    GlContext gl;
    ASSERT_TRUE(gl.ok());
    glBindTexture(0x1234, 0);  // GL_INVALID_ENUM
    log.clear();
    sp<EglEnvironment> other = new EglEnvironment();
    ASSERT_EQ(other->initialize(), 0);
    ASSERT_EQ(log.lines().size(), 1u);
    EXPECT_EQ(log.lines()[0].text.rfind(
                  "GL Clearing error: 0x0500 'GL_INVALID_ENUM' at core/egl/EglEnvironment:", 0),
              0u)
        << log.lines()[0].text;
    EXPECT_EQ(glGetError(), static_cast<GLenum>(GL_NO_ERROR));
    // Same display: terminating it with the fixture also frees the second context.
    gl.release();
}

}  // namespace
