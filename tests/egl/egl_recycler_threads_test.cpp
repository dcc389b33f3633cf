// kiv-test-labels: threads
// EglRecycler fed from several threads at once while the GL thread batches.
#include <GLES2/gl2.h>
#include <gtest/gtest.h>

#include <atomic>
#include <thread>
#include <vector>

#include "core/egl/EglRecycler.h"
#include "core/egl/EglShader.h"
#include "support/gl_context.h"

using android::sp;

namespace {

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
