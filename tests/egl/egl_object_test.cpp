// kiv-test-labels: threads
// EglObject: size slots, and initialize()/release() never overlapping.
#include <gtest/gtest.h>

#include <atomic>
#include <thread>
#include <vector>

#include "core/egl/EglObject.h"

using android::sp;

namespace {

class Probe : public EglObject {
public:
    Probe() = default;
    Probe(int w, int h) : EglObject(w, h) {}
    std::atomic<int> inside{0};
    std::atomic<int> overlaps{0};
    std::atomic<int> inits{0};
    std::atomic<int> releases{0};
    int result = 0;

protected:
    int initialize_l() override {
        enter();
        inits++;
        leave();
        return result;
    }
    void release_l() override {
        enter();
        releases++;
        leave();
    }

private:
    void enter() {
        if (inside.fetch_add(1) != 0) overlaps++;
        // Widen the window in which an unserialised call would overlap.
        for (int i = 0; i < 200; i++) std::this_thread::yield();
    }
    void leave() { inside.fetch_sub(1); }
};

TEST(EglObjectTest, SizeSlotsAndInitializeResult) {
    sp<Probe> empty = new Probe();
    EXPECT_EQ(empty->getWidth(), 0);
    EXPECT_EQ(empty->getHeight(), 0);
    sp<Probe> probe = new Probe(640, 480);
    EXPECT_EQ(probe->getWidth(), 640);
    EXPECT_EQ(probe->getHeight(), 480);
    probe->setSize(32, 16);
    EXPECT_EQ(probe->getWidth(), 32);
    EXPECT_EQ(probe->getHeight(), 16);
    EXPECT_EQ(probe->onDrawFrame(), 0);
    probe->result = -7;
    EXPECT_EQ(probe->initialize(), -7);
    probe->release();
    EXPECT_EQ(probe->inits.load(), 1);
    EXPECT_EQ(probe->releases.load(), 1);
}

TEST(EglObjectTest, InitializeAndReleaseAreSerialised) {
    sp<Probe> probe = new Probe();
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; t++) {
        threads.emplace_back([&, t] {
            for (int i = 0; i < 50; i++) {
                if ((i + t) % 2 == 0) {
                    probe->initialize();
                } else {
                    probe->release();
                }
            }
        });
    }
    for (std::thread& th : threads) th.join();
    EXPECT_EQ(probe->inits.load() + probe->releases.load(), 200);
    EXPECT_EQ(probe->overlaps.load(), 0);
}

}  // namespace
