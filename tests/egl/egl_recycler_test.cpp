// EglRecycler on real GL: pending sets hold each object once, batches delete
// in order, programs lose their shaders but the shaders survive, and the
// destructor runs a last batch.
#include <GLES2/gl2.h>
#include <gtest/gtest.h>

#include <vector>

#include "core/egl/EglImage.h"
#include "core/egl/EglRecycler.h"
#include "core/egl/EglShader.h"
#include "support/gl_context.h"
#include "support/log_capture.h"

using android::sp;
using android::wp;

namespace {

const char kFragment[] = "precision mediump float; void main() { gl_FragColor = vec4(1.0); }";

TEST_F(GlContextTest, TexturesPutTwiceAreDeletedOnce) {
    sp<EglRecycler> recycler = new EglRecycler();
    GLuint textures[3] = {};
    glGenTextures(3, textures);
    for (GLuint t : textures) {
        glBindTexture(GL_TEXTURE_2D, t);  // a name becomes a texture when first bound
    }
    recycler->putTexture(0);
    EXPECT_EQ(recycler->pendingTextures(), 0u);
    recycler->putTexture(textures[1]);
    recycler->putTexture(textures[0]);
    recycler->putTexture(textures[1]);
    EXPECT_EQ(recycler->pendingTextures(), 2u);

    LogCapture log;
    recycler->recycle();
    EXPECT_TRUE(log.lines().empty());
    EXPECT_EQ(recycler->pendingTextures(), 0u);
    EXPECT_FALSE(glIsTexture(textures[0]));
    EXPECT_FALSE(glIsTexture(textures[1]));
    EXPECT_TRUE(glIsTexture(textures[2]));

    // An empty batch leaves everything else alone.
    recycler->recycle();
    EXPECT_TRUE(glIsTexture(textures[2]));
    glDeleteTextures(1, &textures[2]);
    EXPECT_EQ(glGetError(), static_cast<GLenum>(GL_NO_ERROR));
}

TEST_F(GlContextTest, ProgramsAreDetachedAndDeletedButTheirShadersKept) {
    sp<EglRecycler> recycler = new EglRecycler();
    GLuint program = glCreateProgram();
    GLuint vertex = glCreateShader(GL_VERTEX_SHADER);
    GLuint fragment = glCreateShader(GL_FRAGMENT_SHADER);
    glAttachShader(program, vertex);
    glAttachShader(program, fragment);
    recycler->putProgram(0);
    recycler->putProgram(program);
    recycler->putProgram(program);
    EXPECT_EQ(recycler->pendingPrograms(), 1u);

    LogCapture log;
    recycler->recycle();
    EXPECT_TRUE(log.lines().empty());
    EXPECT_FALSE(glIsProgram(program));
    // Detached, so really deleted; the shaders themselves stay.
    EXPECT_TRUE(glIsShader(vertex));
    EXPECT_TRUE(glIsShader(fragment));
    glDeleteShader(vertex);
    glDeleteShader(fragment);
    EXPECT_FALSE(glIsShader(vertex));
    EXPECT_FALSE(glIsShader(fragment));
}

TEST_F(GlContextTest, ShadersAreReleasedOnceAndKeptAliveUntilThen) {
    sp<EglRecycler> recycler = new EglRecycler();
    sp<EglShader> shader = new EglShader();
    ASSERT_EQ(shader->initialize(true), 0);
    unsigned int fragment = shader->loadShader(GL_FRAGMENT_SHADER, kFragment);
    ASSERT_EQ(shader->bindFragmentShader(fragment, true), 0);
    GLuint program = shader->getProgramId();
    GLuint vertex = shader->getVertexId();

    recycler->putEglShader(nullptr);
    EXPECT_EQ(recycler->pendingEglShaders(), 0u);
    recycler->putEglShader(shader);
    recycler->putEglShader(shader);
    EXPECT_EQ(recycler->pendingEglShaders(), 1u);
    // The recycler holds its own reference: dropping ours keeps the object.
    wp<EglShader> weak = shader;
    shader.clear();
    sp<EglShader> promoted = weak.promote();
    ASSERT_NE(promoted, nullptr);
    promoted.clear();

    recycler->recycle();
    EXPECT_EQ(recycler->pendingEglShaders(), 0u);
    EXPECT_EQ(weak.promote(), nullptr);
    EXPECT_FALSE(glIsProgram(program));
    EXPECT_FALSE(glIsShader(vertex));
    EXPECT_FALSE(glIsShader(fragment));
}

TEST_F(GlContextTest, ImagesAreReleasedOnceAndNullIsIgnored) {
    sp<EglRecycler> recycler = new EglRecycler();
    sp<EglImage> image = new EglImage(EglImage::IMAGE_FRAMEBUFFER, 4, 4);
    ASSERT_EQ(image->initialize(), 0);
    GLuint texture = image->getTextureID();
    GLuint framebuffer = image->getFrameBufferID();
    ASSERT_TRUE(glIsTexture(texture));
    ASSERT_TRUE(glIsFramebuffer(framebuffer));

    recycler->putEglImage(nullptr);
    EXPECT_EQ(recycler->pendingEglImages(), 0u);
    recycler->putEglImage(image);
    recycler->putEglImage(image);
    EXPECT_EQ(recycler->pendingEglImages(), 1u);
    EXPECT_TRUE(glIsTexture(texture));  // nothing happens before the batch

    recycler->recycle();
    EXPECT_EQ(recycler->pendingEglImages(), 0u);
    EXPECT_FALSE(glIsTexture(texture));
    EXPECT_FALSE(glIsFramebuffer(framebuffer));
    EXPECT_FALSE(image->isInitialized());
    EXPECT_EQ(image->getTextureID(), 0u);
}

TEST_F(GlContextTest, DestructorRunsTheLastBatch) {
    GLuint texture = GlTest_makeTexture2D(2, 2, nullptr);
    GLuint program = glCreateProgram();
    {
        sp<EglRecycler> recycler = new EglRecycler();
        recycler->putTexture(texture);
        recycler->putProgram(program);
    }
    EXPECT_FALSE(glIsTexture(texture));
    EXPECT_FALSE(glIsProgram(program));
}

}  // namespace
