// kiv-test-labels: threads
// EglRecycler on real GL: pending sets hold each object once, a batch deletes
// them (programs lose their shaders but the shaders survive, shaders and
// images are released and kept alive until then), the destructor runs a last
// batch, and puts from several threads race a batch.
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

TEST_F(GlContextTest, EachObjectIsDeletedOnceInTheNextBatch) {
    sp<EglRecycler> recycler = new EglRecycler();
    GLuint textures[3] = {};
    glGenTextures(3, textures);
    for (GLuint t : textures) glBindTexture(GL_TEXTURE_2D, t);  // a name becomes a texture here
    GLuint program = glCreateProgram(), vertex = glCreateShader(GL_VERTEX_SHADER);
    glAttachShader(program, vertex);
    sp<EglShader> shader = new EglShader();
    ASSERT_EQ(shader->initialize(true), 0);
    sp<EglImage> image = new EglImage(EglImage::IMAGE_FRAMEBUFFER, 4, 4);
    ASSERT_EQ(image->initialize(), 0);
    const GLuint shaderProgram = shader->getProgramId(), imageTexture = image->getTextureID();
    recycler->putTexture(0);
    recycler->putProgram(0);
    recycler->putEglShader(nullptr);
    recycler->putEglImage(nullptr);
    for (int i = 0; i < 2; i++) {
        for (GLuint t : {textures[1], textures[0]}) recycler->putTexture(t);
        recycler->putProgram(program);
        recycler->putEglShader(shader);
        recycler->putEglImage(image);
    }
    EXPECT_EQ(std::vector<size_t>({2, 1, 1, 1}),
              std::vector<size_t>({recycler->pendingTextures(), recycler->pendingPrograms(),
                                   recycler->pendingEglShaders(), recycler->pendingEglImages()}));
    EXPECT_TRUE(glIsTexture(imageTexture));  // nothing happens before the batch
    // The recycler holds its own reference: dropping ours keeps the object.
    wp<EglShader> weak = shader;
    shader.clear();
    ASSERT_NE(weak.promote(), nullptr);
    LogCapture log;  // a second delete of a name would raise a GL error and log it
    recycler->recycle();
    EXPECT_TRUE(log.lines().empty());
    EXPECT_EQ(0u, recycler->pendingTextures() + recycler->pendingPrograms() +
                      recycler->pendingEglShaders() + recycler->pendingEglImages());
    EXPECT_FALSE(glIsTexture(textures[0]) || glIsTexture(textures[1]) || glIsProgram(program));
    EXPECT_TRUE(glIsTexture(textures[2]));
    EXPECT_TRUE(glIsShader(vertex));  // detached, so the program is really deleted
    EXPECT_EQ(weak.promote(), nullptr);
    EXPECT_FALSE(glIsProgram(shaderProgram) || glIsTexture(imageTexture));
    EXPECT_FALSE(image->isInitialized());
    recycler->recycle();  // an empty batch leaves everything else alone
    EXPECT_TRUE(glIsTexture(textures[2]));
    glDeleteTextures(1, &textures[2]);
    glDeleteShader(vertex);
    // The destructor runs the last batch.
    GLuint last = GlTest_makeTexture2D(2, 2, nullptr);
    recycler->putTexture(last);
    recycler.clear();
    EXPECT_FALSE(glIsTexture(last));
}

TEST_F(GlContextTest, ConcurrentPutsKeepEachNameOnce) {
    sp<EglRecycler> recycler = new EglRecycler();
    sp<EglShader> shared = new EglShader();
    const unsigned int kNames = 500;
    std::vector<std::thread> threads;
    // Every thread puts the same names (far above any the context hands out)
    // and the same shader, in its own order.
    for (int t = 0; t < 4; t++)
        threads.emplace_back([&, t] {
            for (unsigned int i = 0; i < kNames; i++) {
                unsigned int name = 100000 + ((t % 2 == 0) ? i + 1 : kNames - i);
                recycler->putTexture(name);
                recycler->putProgram(name);
                recycler->putEglShader(shared);
            }
        });
    for (std::thread& th : threads) th.join();
    EXPECT_EQ(std::vector<size_t>({kNames, kNames, 1}),
              std::vector<size_t>({recycler->pendingTextures(), recycler->pendingPrograms(),
                                   recycler->pendingEglShaders()}));
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
    size_t alive = 0;
    for (GLuint name : real) alive += glIsTexture(name) ? 1 : 0;
    EXPECT_EQ(recycler->pendingTextures(), alive);
    recycler->recycle();
    for (GLuint name : real) ASSERT_FALSE(glIsTexture(name)) << name;
}

}  // namespace
