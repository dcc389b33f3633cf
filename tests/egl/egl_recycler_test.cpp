// kiv-test-labels: threads
// EglRecycler on real GL: pending sets hold each object once, batches delete
// in order, programs lose their shaders but the shaders survive, the
// destructor runs a last batch, and puts from several threads race a batch.
#include <GLES2/gl2.h>
#include <gtest/gtest.h>

#include <atomic>
#include <thread>
#include <vector>

#include "core/egl/EglImage.h"
#include "core/egl/EglRecycler.h"
#include "core/egl/EglShader.h"
#include "support/gl_context.h"
#include "support/log_capture.h"

using android::sp;
using android::wp;

namespace {

TEST_F(GlContextTest, NamesPutTwiceAreDeletedOnceAndProgramsKeepTheirShaders) {
    sp<EglRecycler> recycler = new EglRecycler();
    GLuint textures[3] = {};
    glGenTextures(3, textures);
    for (GLuint t : textures) glBindTexture(GL_TEXTURE_2D, t);  // a name becomes a texture here
    GLuint program = glCreateProgram();
    GLuint vertex = glCreateShader(GL_VERTEX_SHADER);
    GLuint fragment = glCreateShader(GL_FRAGMENT_SHADER);
    glAttachShader(program, vertex);
    glAttachShader(program, fragment);

    recycler->putTexture(0);
    recycler->putProgram(0);
    EXPECT_EQ(recycler->pendingTextures() + recycler->pendingPrograms(), 0u);
    for (GLuint t : {textures[1], textures[0], textures[1]}) recycler->putTexture(t);
    recycler->putProgram(program);
    recycler->putProgram(program);
    EXPECT_EQ(recycler->pendingTextures(), 2u);
    EXPECT_EQ(recycler->pendingPrograms(), 1u);

    LogCapture log;  // a second delete of a name would raise a GL error and log it
    recycler->recycle();
    EXPECT_TRUE(log.lines().empty());
    EXPECT_EQ(recycler->pendingTextures() + recycler->pendingPrograms(), 0u);
    EXPECT_FALSE(glIsTexture(textures[0]));
    EXPECT_FALSE(glIsTexture(textures[1]));
    EXPECT_TRUE(glIsTexture(textures[2]));
    EXPECT_FALSE(glIsProgram(program));
    // Detached, so really deleted; the shaders themselves stay.
    EXPECT_TRUE(glIsShader(vertex));
    EXPECT_TRUE(glIsShader(fragment));

    recycler->recycle();  // an empty batch leaves everything else alone
    EXPECT_TRUE(glIsTexture(textures[2]));
    glDeleteTextures(1, &textures[2]);
    glDeleteShader(vertex);
    glDeleteShader(fragment);
    EXPECT_FALSE(glIsShader(vertex));
    EXPECT_EQ(glGetError(), static_cast<GLenum>(GL_NO_ERROR));
}

TEST_F(GlContextTest, ShadersAndImagesAreReleasedOnceAndKeptAliveUntilThen) {
    sp<EglRecycler> recycler = new EglRecycler();
    sp<EglShader> shader = new EglShader();
    ASSERT_EQ(shader->initialize(true), 0);
    unsigned int fragment = shader->loadShader(
        GL_FRAGMENT_SHADER, "precision mediump float; void main() { gl_FragColor = vec4(1.0); }");
    ASSERT_EQ(shader->bindFragmentShader(fragment, true), 0);
    GLuint program = shader->getProgramId();
    GLuint vertex = shader->getVertexId();
    sp<EglImage> image = new EglImage(EglImage::IMAGE_FRAMEBUFFER, 4, 4);
    ASSERT_EQ(image->initialize(), 0);
    GLuint texture = image->getTextureID();
    GLuint framebuffer = image->getFrameBufferID();

    recycler->putEglShader(nullptr);
    recycler->putEglImage(nullptr);
    EXPECT_EQ(recycler->pendingEglShaders() + recycler->pendingEglImages(), 0u);
    for (int i = 0; i < 2; i++) {
        recycler->putEglShader(shader);
        recycler->putEglImage(image);
    }
    EXPECT_EQ(recycler->pendingEglShaders(), 1u);
    EXPECT_EQ(recycler->pendingEglImages(), 1u);
    EXPECT_TRUE(glIsTexture(texture));  // nothing happens before the batch
    // The recycler holds its own reference: dropping ours keeps the object.
    wp<EglShader> weak = shader;
    shader.clear();
    ASSERT_NE(weak.promote(), nullptr);

    recycler->recycle();
    EXPECT_EQ(recycler->pendingEglShaders() + recycler->pendingEglImages(), 0u);
    EXPECT_EQ(weak.promote(), nullptr);
    EXPECT_FALSE(glIsProgram(program));
    EXPECT_FALSE(glIsShader(vertex));
    EXPECT_FALSE(glIsShader(fragment));
    EXPECT_FALSE(glIsTexture(texture));
    EXPECT_FALSE(glIsFramebuffer(framebuffer));
    EXPECT_FALSE(image->isInitialized());
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

TEST_F(GlContextTest, ConcurrentPutsKeepEachNameOnce) {
    sp<EglRecycler> recycler = new EglRecycler();
    sp<EglShader> shared = new EglShader();
    const unsigned int kNames = 500;
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; t++) {
        // Every thread puts the same names and the same shader, in its own order.
        threads.emplace_back([&, t] {
            for (unsigned int i = 0; i < kNames; i++) {
                // Far above any name the context hands out below.
                unsigned int name = 100000 + ((t % 2 == 0) ? i + 1 : kNames - i);
                recycler->putTexture(name);
                recycler->putProgram(name);
                recycler->putEglShader(shared);
            }
        });
    }
    for (std::thread& th : threads) th.join();
    EXPECT_EQ(recycler->pendingTextures(), kNames);
    EXPECT_EQ(recycler->pendingPrograms(), kNames);
    EXPECT_EQ(recycler->pendingEglShaders(), 1u);

    // Puts racing a batch on the GL thread: each texture lands either in this
    // batch (deleted) or in the next one (still alive and pending), never lost.
    std::vector<GLuint> real(kNames);
    glGenTextures(kNames, real.data());
    for (GLuint name : real) glBindTexture(GL_TEXTURE_2D, name);
    glBindTexture(GL_TEXTURE_2D, 0);
    std::atomic<bool> go(false);
    std::thread late([&] {
        while (!go.load()) std::this_thread::yield();
        for (GLuint name : real) recycler->putTexture(name);
    });
    go.store(true);
    recycler->recycle();
    late.join();
    EXPECT_EQ(recycler->pendingPrograms(), 0u);
    EXPECT_EQ(recycler->pendingEglShaders(), 0u);
    size_t alive = 0;
    for (GLuint name : real) alive += glIsTexture(name) ? 1 : 0;
    EXPECT_EQ(recycler->pendingTextures(), alive);
    recycler->recycle();
    EXPECT_EQ(recycler->pendingTextures(), 0u);
    for (GLuint name : real) ASSERT_FALSE(glIsTexture(name)) << name;
    EXPECT_EQ(glGetError(), static_cast<GLenum>(GL_NO_ERROR));
}

}  // namespace
