// What the host graphics layer stands on, checked on the real Mesa: images
// from 2D textures seen through external textures and renderbuffers, fence
// syncs, and a second context reading on another thread.
// kiv-test-labels: threads
#include <EGL/egl.h>
#include <EGL/eglext.h>
#include <GLES2/gl2.h>
#include <GLES2/gl2ext.h>
#include <gtest/gtest.h>

#include <thread>
#include <vector>

#include "core/egl/EglEnvironment.h"
#include "support/gl_context.h"

namespace {

const char kVertex[] =
    "attribute vec2 pos; varying vec2 uv; void main() { uv = pos * 0.5 + 0.5; "
    "gl_Position = vec4(pos, 0.0, 1.0); }";
const char kExternalFragment[] =
    "#extension GL_OES_EGL_image_external : require\n"
    "precision mediump float; uniform samplerExternalOES tex; varying vec2 uv; "
    "void main() { gl_FragColor = texture2D(tex, uv); }";

GLuint compile(GLenum type, const char* source) {
    GLuint shader = glCreateShader(type);
    glShaderSource(shader, 1, &source, nullptr);
    glCompileShader(shader);
    GLint ok = 0;
    glGetShaderiv(shader, GL_COMPILE_STATUS, &ok);
    EXPECT_EQ(ok, GL_TRUE);
    return shader;
}

// Draws the bound external texture over the whole viewport.
void drawExternal(int width, int height) {
    GLuint vs = compile(GL_VERTEX_SHADER, kVertex);
    GLuint fs = compile(GL_FRAGMENT_SHADER, kExternalFragment);
    GLuint program = glCreateProgram();
    glAttachShader(program, vs);
    glAttachShader(program, fs);
    glBindAttribLocation(program, 0, "pos");
    glLinkProgram(program);
    glUseProgram(program);
    glUniform1i(glGetUniformLocation(program, "tex"), 0);
    const float quad[] = {-1, -1, 1, -1, -1, 1, 1, 1};
    glVertexAttribPointer(0, 2, GL_FLOAT, GL_FALSE, 0, quad);
    glEnableVertexAttribArray(0);
    glViewport(0, 0, width, height);
    glDrawArrays(GL_TRIANGLE_STRIP, 0, 4);
    glDisableVertexAttribArray(0);
    glUseProgram(0);
    glDeleteProgram(program);
    glDeleteShader(vs);
    glDeleteShader(fs);
}

std::vector<uint8_t> solid(int count, uint8_t r, uint8_t g, uint8_t b) {
    std::vector<uint8_t> pixels;
    for (int i = 0; i < count; ++i) pixels.insert(pixels.end(), {r, g, b, 255});
    return pixels;
}

struct Procs {
    PFNEGLCREATEIMAGEKHRPROC createImage =
        reinterpret_cast<PFNEGLCREATEIMAGEKHRPROC>(eglGetProcAddress("eglCreateImageKHR"));
    PFNEGLDESTROYIMAGEKHRPROC destroyImage =
        reinterpret_cast<PFNEGLDESTROYIMAGEKHRPROC>(eglGetProcAddress("eglDestroyImageKHR"));
    PFNGLEGLIMAGETARGETTEXTURE2DOESPROC targetTexture =
        reinterpret_cast<PFNGLEGLIMAGETARGETTEXTURE2DOESPROC>(
            eglGetProcAddress("glEGLImageTargetTexture2DOES"));
    PFNGLEGLIMAGETARGETRENDERBUFFERSTORAGEOESPROC targetRenderbuffer =
        reinterpret_cast<PFNGLEGLIMAGETARGETRENDERBUFFERSTORAGEOESPROC>(
            eglGetProcAddress("glEGLImageTargetRenderbufferStorageOES"));
    PFNEGLCREATESYNCKHRPROC createSync =
        reinterpret_cast<PFNEGLCREATESYNCKHRPROC>(eglGetProcAddress("eglCreateSyncKHR"));
    PFNEGLCLIENTWAITSYNCKHRPROC clientWait =
        reinterpret_cast<PFNEGLCLIENTWAITSYNCKHRPROC>(eglGetProcAddress("eglClientWaitSyncKHR"));
    PFNEGLDESTROYSYNCKHRPROC destroySync =
        reinterpret_cast<PFNEGLDESTROYSYNCKHRPROC>(eglGetProcAddress("eglDestroySyncKHR"));
};

class MesaEglTest : public GlContextTest {};

TEST_F(MesaEglTest, ImageFromTextureShowsThroughExternalTextureAndRenderbuffer) {
    Procs gl;
    ASSERT_NE(gl.createImage, nullptr);
    ASSERT_NE(gl.targetTexture, nullptr);
    ASSERT_NE(gl.targetRenderbuffer, nullptr);
    const int w = 8;
    const int h = 4;
    GLuint storage = GlTest_makeTexture2D(w, h, solid(w * h, 10, 20, 30).data());
    const EGLint attribs[] = {EGL_GL_TEXTURE_LEVEL_KHR, 0, EGL_IMAGE_PRESERVED_KHR, EGL_TRUE,
                              EGL_NONE};
    EGLImageKHR image =
        gl.createImage(eglGetCurrentDisplay(), eglGetCurrentContext(), EGL_GL_TEXTURE_2D_KHR,
                       reinterpret_cast<EGLClientBuffer>(static_cast<uintptr_t>(storage)), attribs);
    ASSERT_NE(image, EGL_NO_IMAGE_KHR);

    GLuint external = 0;
    glGenTextures(1, &external);
    glBindTexture(GL_TEXTURE_EXTERNAL_OES, external);
    glTexParameteri(GL_TEXTURE_EXTERNAL_OES, GL_TEXTURE_MIN_FILTER, GL_NEAREST);
    glTexParameteri(GL_TEXTURE_EXTERNAL_OES, GL_TEXTURE_MAG_FILTER, GL_NEAREST);
    gl.targetTexture(GL_TEXTURE_EXTERNAL_OES, static_cast<GLeglImageOES>(image));
    ASSERT_EQ(glGetError(), static_cast<GLenum>(GL_NO_ERROR));

    // A later upload into the 2D texture shows through the external one.
    std::vector<uint8_t> later = solid(w * h, 200, 100, 50);
    glBindTexture(GL_TEXTURE_2D, storage);
    glTexSubImage2D(GL_TEXTURE_2D, 0, 0, 0, w, h, GL_RGBA, GL_UNSIGNED_BYTE, later.data());
    glBindTexture(GL_TEXTURE_2D, 0);

    GlTarget target;
    ASSERT_TRUE(GlTest_makeTarget(w, h, &target));
    glActiveTexture(GL_TEXTURE0);
    glBindTexture(GL_TEXTURE_EXTERNAL_OES, external);
    drawExternal(w, h);
    EXPECT_EQ(GlTest_readPixels(w, h), later);

    // The same image as a renderbuffer completes a framebuffer and renders
    // into the texture's storage.
    GLuint renderbuffer = 0;
    GLuint framebuffer = 0;
    glGenRenderbuffers(1, &renderbuffer);
    glBindRenderbuffer(GL_RENDERBUFFER, renderbuffer);
    gl.targetRenderbuffer(GL_RENDERBUFFER, static_cast<GLeglImageOES>(image));
    glGenFramebuffers(1, &framebuffer);
    glBindFramebuffer(GL_FRAMEBUFFER, framebuffer);
    glFramebufferRenderbuffer(GL_FRAMEBUFFER, GL_COLOR_ATTACHMENT0, GL_RENDERBUFFER, renderbuffer);
    ASSERT_EQ(glCheckFramebufferStatus(GL_FRAMEBUFFER),
              static_cast<GLenum>(GL_FRAMEBUFFER_COMPLETE));
    glClearColor(0.0f, 1.0f, 0.0f, 1.0f);
    glClear(GL_COLOR_BUFFER_BIT);
    glBindFramebuffer(GL_FRAMEBUFFER, target.framebuffer);
    drawExternal(w, h);
    EXPECT_EQ(GlTest_readPixels(w, h), solid(w * h, 0, 255, 0));

    glBindFramebuffer(GL_FRAMEBUFFER, 0);
    glDeleteFramebuffers(1, &framebuffer);
    glDeleteRenderbuffers(1, &renderbuffer);
    glDeleteTextures(1, &external);
    glDeleteTextures(1, &storage);
    GlTest_deleteTarget(&target);
    EXPECT_EQ(gl.destroyImage(eglGetCurrentDisplay(), image), static_cast<EGLBoolean>(EGL_TRUE));
}

TEST_F(MesaEglTest, SharedContextOnAnotherThreadReadsAfterFence) {
    Procs gl;
    ASSERT_NE(gl.createSync, nullptr);
    EGLDisplay display = mGl->env()->getEGLDisplay();
    EGLConfig config = mGl->env()->getEGLConfig();
    const EGLint contextAttribs[] = {EGL_CONTEXT_CLIENT_VERSION, 2, EGL_NONE};
    EGLContext second =
        eglCreateContext(display, config, mGl->env()->getEGLContext(), contextAttribs);
    ASSERT_NE(second, EGL_NO_CONTEXT);

    const int w = 16;
    const int h = 16;
    GlTarget target;
    ASSERT_TRUE(GlTest_makeTarget(w, h, &target));
    glClearColor(1.0f, 0.0f, 0.0f, 1.0f);
    glClear(GL_COLOR_BUFFER_BIT);
    glEnable(GL_SCISSOR_TEST);
    glScissor(0, 0, w, h / 2);
    glClearColor(0.0f, 0.0f, 1.0f, 1.0f);
    glClear(GL_COLOR_BUFFER_BIT);
    glDisable(GL_SCISSOR_TEST);
    EGLSyncKHR sync = gl.createSync(display, EGL_SYNC_FENCE_KHR, nullptr);
    ASSERT_NE(sync, EGL_NO_SYNC_KHR);

    std::vector<uint8_t> seen;
    EGLint waited = 0;
    std::thread reader([&] {
        if (!eglMakeCurrent(display, EGL_NO_SURFACE, EGL_NO_SURFACE, second)) return;
        waited = gl.clientWait(display, sync, EGL_SYNC_FLUSH_COMMANDS_BIT_KHR, EGL_FOREVER_KHR);
        GLuint framebuffer = 0;
        glGenFramebuffers(1, &framebuffer);
        glBindFramebuffer(GL_FRAMEBUFFER, framebuffer);
        glFramebufferTexture2D(GL_FRAMEBUFFER, GL_COLOR_ATTACHMENT0, GL_TEXTURE_2D, target.texture,
                               0);
        if (glCheckFramebufferStatus(GL_FRAMEBUFFER) == GL_FRAMEBUFFER_COMPLETE) {
            seen = GlTest_readPixels(w, h);
        }
        glDeleteFramebuffers(1, &framebuffer);
        eglMakeCurrent(display, EGL_NO_SURFACE, EGL_NO_SURFACE, EGL_NO_CONTEXT);
    });
    reader.join();
    EXPECT_EQ(waited, EGL_CONDITION_SATISFIED_KHR);
    ASSERT_EQ(seen.size(), static_cast<size_t>(w * h * 4));
    std::vector<uint8_t> expected = solid(w * h / 2, 0, 0, 255);
    std::vector<uint8_t> top = solid(w * h / 2, 255, 0, 0);
    expected.insert(expected.end(), top.begin(), top.end());
    EXPECT_EQ(seen, expected);

    gl.destroySync(display, sync);
    GlTest_deleteTarget(&target);
    eglDestroyContext(display, second);
}

}  // namespace
