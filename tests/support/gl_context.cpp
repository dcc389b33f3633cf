#include "support/gl_context.h"

#include <stdlib.h>
#include <string.h>
#include <ui/GraphicBuffer.h>

#include <algorithm>
#include <utility>

#include "core/egl/EglEnvironment.h"
#include "core/egl/EglExtensions.h"
#include "core/egl/EglNativeSeam.h"
#include "core/egl/EglWindowSurface.h"

GlContext::GlContext() {
    // Test programs may run outside ctest, which sets this for them.
    setenv("EGL_PLATFORM", "surfaceless", 0);
    mEnv = new EglEnvironment();
    if (mEnv->initialize() != 0) return;
    mSurface = new EglWindowSurface(mEnv);
    if (mSurface->initialize() != 0) return;
    if (mSurface->bindSurface() != 0) return;
    mOk = true;
}

GlContext::~GlContext() {
    release();
}

void GlContext::release() {
    if (mSurface != nullptr) {
        mSurface->unbindSurface();
        mSurface->release();
        mSurface.clear();
    }
    if (mEnv != nullptr) {
        mEnv->release();
        mEnv.clear();
    }
    mOk = false;
}

namespace {

void nearestClamped(GLenum target) {
    glTexParameteri(target, GL_TEXTURE_MIN_FILTER, GL_NEAREST);
    glTexParameteri(target, GL_TEXTURE_MAG_FILTER, GL_NEAREST);
    glTexParameteri(target, GL_TEXTURE_WRAP_S, GL_CLAMP_TO_EDGE);
    glTexParameteri(target, GL_TEXTURE_WRAP_T, GL_CLAMP_TO_EDGE);
}

}  // namespace

GLuint GlTest_makeTexture2D(int width, int height, const uint8_t* pixels) {
    GLuint texture = 0;
    glGenTextures(1, &texture);
    glBindTexture(GL_TEXTURE_2D, texture);
    nearestClamped(GL_TEXTURE_2D);
    glPixelStorei(GL_UNPACK_ALIGNMENT, 1);
    glTexImage2D(GL_TEXTURE_2D, 0, GL_RGBA, width, height, 0, GL_RGBA, GL_UNSIGNED_BYTE, pixels);
    glBindTexture(GL_TEXTURE_2D, 0);
    return texture;
}

bool GlTest_makeExternalTexture(int width, int height, const uint8_t* pixels,
                                GlExternalTexture* out) {
    auto createImage = EglExtensions::get().eglCreateImageKHR;
    auto targetTexture = EglExtensions::get().glEGLImageTargetTexture2DOES;
    if (createImage == nullptr || targetTexture == nullptr) return false;

    out->storage = GlTest_makeTexture2D(width, height, pixels);
    const EGLint attribs[] = {EGL_GL_TEXTURE_LEVEL_KHR, 0, EGL_NONE};
    out->image = createImage(
        eglGetCurrentDisplay(), eglGetCurrentContext(), EGL_GL_TEXTURE_2D_KHR,
        reinterpret_cast<EGLClientBuffer>(static_cast<uintptr_t>(out->storage)), attribs);
    if (out->image == EGL_NO_IMAGE_KHR) return false;
    glGenTextures(1, &out->external);
    glBindTexture(GL_TEXTURE_EXTERNAL_OES, out->external);
    nearestClamped(GL_TEXTURE_EXTERNAL_OES);
    targetTexture(GL_TEXTURE_EXTERNAL_OES, static_cast<GLeglImageOES>(out->image));
    glBindTexture(GL_TEXTURE_EXTERNAL_OES, 0);
    return glGetError() == GL_NO_ERROR;
}

void GlTest_deleteExternalTexture(GlExternalTexture* texture) {
    auto destroyImage = EglExtensions::get().eglDestroyImageKHR;
    if (texture->external != 0) glDeleteTextures(1, &texture->external);
    if (texture->storage != 0) glDeleteTextures(1, &texture->storage);
    if (texture->image != EGL_NO_IMAGE_KHR && destroyImage != nullptr) {
        destroyImage(eglGetCurrentDisplay(), texture->image);
    }
    *texture = GlExternalTexture();
}

bool GlTest_makeTarget(int width, int height, GlTarget* out) {
    out->width = width;
    out->height = height;
    out->texture = GlTest_makeTexture2D(width, height, nullptr);
    glGenFramebuffers(1, &out->framebuffer);
    glBindFramebuffer(GL_FRAMEBUFFER, out->framebuffer);
    glFramebufferTexture2D(GL_FRAMEBUFFER, GL_COLOR_ATTACHMENT0, GL_TEXTURE_2D, out->texture, 0);
    return glCheckFramebufferStatus(GL_FRAMEBUFFER) == GL_FRAMEBUFFER_COMPLETE;
}

void GlTest_deleteTarget(GlTarget* target) {
    glBindFramebuffer(GL_FRAMEBUFFER, 0);
    if (target->framebuffer != 0) glDeleteFramebuffers(1, &target->framebuffer);
    if (target->texture != 0) glDeleteTextures(1, &target->texture);
    *target = GlTarget();
}

void GlTest_fillHalves(int width, int height) {
    glViewport(0, 0, width, height);
    glClearColor(0.0f, 0.0f, 1.0f, 1.0f);
    glClear(GL_COLOR_BUFFER_BIT);
    glEnable(GL_SCISSOR_TEST);
    glScissor(0, 0, width, height / 2);
    glClearColor(1.0f, 0.0f, 0.0f, 1.0f);
    glClear(GL_COLOR_BUFFER_BIT);
    glDisable(GL_SCISSOR_TEST);
}

std::vector<uint8_t> GlTest_readPixels(int width, int height) {
    std::vector<uint8_t> pixels(static_cast<size_t>(width) * height * 4);
    glPixelStorei(GL_PACK_ALIGNMENT, 1);
    glReadPixels(0, 0, width, height, GL_RGBA, GL_UNSIGNED_BYTE, pixels.data());
    return pixels;
}

int GlTest_liveObjects(int range) {
    // Mesa hands out names upwards without reusing freed ones at once: scan
    // at least up to the names it would give next, so that long-running work
    // does not move its objects out of view.
    GLuint top = GLuint(range), name = 0;
    const std::pair<void (*)(GLsizei, GLuint*), void (*)(GLsizei, const GLuint*)> kinds[] = {
        {glGenTextures, glDeleteTextures},
        {glGenFramebuffers, glDeleteFramebuffers},
        {glGenRenderbuffers, glDeleteRenderbuffers},
        {glGenBuffers, glDeleteBuffers}};
    for (const auto& kind : kinds) {
        kind.first(1, &name);
        kind.second(1, &name);
        top = std::max(top, name);
    }
    name = glCreateProgram();  // programs and shaders share their names
    glDeleteProgram(name);
    top = std::max(top, name);
    int n = 0;
    for (name = 1; name <= top; ++name) {
        n += glIsTexture(name) + glIsFramebuffer(name) + glIsRenderbuffer(name) +
             glIsProgram(name) + glIsShader(name) + glIsBuffer(name);
    }
    return n;
}

GlBufferView::GlBufferView(EGLDisplay display, const android::sp<android::GraphicBuffer>& buffer)
    : mDisplay(display), mWidth((int)buffer->getWidth()), mHeight((int)buffer->getHeight()) {
    mImage = EglNativeSeam::get().createNativeBufferImage(display, buffer.get());
    if (mImage == EGL_NO_IMAGE_KHR) return;
    glGenRenderbuffers(1, &mRenderbuffer);
    glBindRenderbuffer(GL_RENDERBUFFER, mRenderbuffer);
    EglExtensions::get().glEGLImageTargetRenderbufferStorageOES(GL_RENDERBUFFER,
                                                                static_cast<GLeglImageOES>(mImage));
    glGenFramebuffers(1, &mFramebuffer);
    bind();
    glFramebufferRenderbuffer(GL_FRAMEBUFFER, GL_COLOR_ATTACHMENT0, GL_RENDERBUFFER, mRenderbuffer);
    mOk = glCheckFramebufferStatus(GL_FRAMEBUFFER) == GL_FRAMEBUFFER_COMPLETE;
}

GlBufferView::~GlBufferView() {
    glBindFramebuffer(GL_FRAMEBUFFER, 0);
    glDeleteFramebuffers(1, &mFramebuffer);
    glDeleteRenderbuffers(1, &mRenderbuffer);
    if (mImage != EGL_NO_IMAGE_KHR) EglNativeSeam::get().destroyImage(mDisplay, mImage);
}

void GlBufferView::bind() {
    glBindFramebuffer(GL_FRAMEBUFFER, mFramebuffer);
}

std::vector<uint8_t> GlBufferView::pixels() {
    if (!mOk) return {};
    bind();
    return GlTest_readPixels(mWidth, mHeight);
}

std::vector<uint8_t> GlTest_bufferPixels(EGLDisplay display,
                                         const android::sp<android::GraphicBuffer>& buffer) {
    return GlBufferView(display, buffer).pixels();
}

void GlContextTest::SetUp() {
    mGl = new GlContext();
    ASSERT_TRUE(mGl->ok()) << "no EGL context (Mesa llvmpipe, EGL_PLATFORM=surfaceless)";
    mLiveAtStart = GlTest_liveObjects(4096);
}

void GlContextTest::TearDown() {
    // Every GL test is a leak test too, while its context is still current.
    if (mGl->ok() && eglGetCurrentContext() == mGl->env()->getEGLContext()) {
        EXPECT_EQ(mLiveAtStart, GlTest_liveObjects(4096)) << "GL objects the test left alive";
    }
    delete mGl;
    mGl = nullptr;
}
