// A real GL context for tests (Mesa llvmpipe, headless): an EglEnvironment
// with a bound 1x1 pbuffer EglWindowSurface, and plain-GL helpers to make
// input textures and render targets and read them back.
#ifndef KIV_TESTS_GL_CONTEXT_H
#define KIV_TESTS_GL_CONTEXT_H

#include <EGL/egl.h>
#include <EGL/eglext.h>
#include <GLES2/gl2.h>
#include <GLES2/gl2ext.h>
#include <gtest/gtest.h>
#include <utils/StrongPointer.h>

#include <cstdint>
#include <vector>

class EglEnvironment;
class EglWindowSurface;
namespace android {
class GraphicBuffer;
}

// Current on the constructing thread from construction until release().
class GlContext {
public:
    GlContext();
    ~GlContext();
    bool ok() const { return mOk; }
    // Unbinds and releases the surface, then the environment. Idempotent.
    void release();
    const android::sp<EglEnvironment>& env() const { return mEnv; }
    const android::sp<EglWindowSurface>& surface() const { return mSurface; }
    GlContext(const GlContext&) = delete;
    GlContext& operator=(const GlContext&) = delete;

private:
    android::sp<EglEnvironment> mEnv;
    android::sp<EglWindowSurface> mSurface;
    bool mOk = false;
};

// A clamped, nearest-filtered 2D RGBA texture; pixels (tight rows, first row
// at t = 0) may be null.
GLuint GlTest_makeTexture2D(int width, int height, const uint8_t* pixels);

// An external texture whose storage is a 2D RGBA texture holding pixels,
// shared through an EGLImageKHR.
struct GlExternalTexture {
    GLuint external = 0;
    GLuint storage = 0;
    EGLImageKHR image = EGL_NO_IMAGE_KHR;
};
bool GlTest_makeExternalTexture(int width, int height, const uint8_t* pixels,
                                GlExternalTexture* out);
void GlTest_deleteExternalTexture(GlExternalTexture* texture);

// An RGBA framebuffer with a texture colour attachment, left bound.
struct GlTarget {
    GLuint framebuffer = 0;
    GLuint texture = 0;
    int width = 0;
    int height = 0;
};
bool GlTest_makeTarget(int width, int height, GlTarget* out);
void GlTest_deleteTarget(GlTarget* target);
// Clears the bound framebuffer's lower half of GL rows red, the rest blue.
void GlTest_fillHalves(int width, int height);
// Reads the bound framebuffer; row 0 is the bottom row (GL order).
std::vector<uint8_t> GlTest_readPixels(int width, int height);

// Live GL objects (textures, framebuffers, renderbuffers, programs, shaders,
// buffers) among the first `range` names of each kind, and up to the names
// the context would hand out next, in the current context.
int GlTest_liveObjects(int range);

// A GraphicBuffer as the current context sees it: its EGL image (made through
// the EGL seam) as the renderbuffer of a framebuffer, bound by bind().
class GlBufferView {
public:
    GlBufferView(EGLDisplay display, const android::sp<android::GraphicBuffer>& buffer);
    ~GlBufferView();
    bool ok() const { return mOk; }
    void bind();
    // The whole buffer, row 0 first; empty when the view could not be made.
    std::vector<uint8_t> pixels();
    GlBufferView(const GlBufferView&) = delete;
    GlBufferView& operator=(const GlBufferView&) = delete;

private:
    EGLDisplay mDisplay;
    EGLImageKHR mImage = EGL_NO_IMAGE_KHR;
    GLuint mRenderbuffer = 0, mFramebuffer = 0;
    int mWidth = 0, mHeight = 0;
    bool mOk = false;
};
// The buffer as the GPU sees it right now (through a view made and dropped).
std::vector<uint8_t> GlTest_bufferPixels(EGLDisplay display,
                                         const android::sp<android::GraphicBuffer>& buffer);

// Fixture: a context per test; fails the test at once when it cannot be
// made, and at its end when it left GL objects alive in the context.
class GlContextTest : public ::testing::Test {
protected:
    void SetUp() override;
    void TearDown() override;
    GlContext* mGl = nullptr;
    int mLiveAtStart = 0;
};

#endif
