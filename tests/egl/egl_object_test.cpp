// kiv-test-labels: threads
// EglObject: initialize()/release() never overlapping, and their results.
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
    std::atomic<int> inside{0}, overlaps{0}, inits{0}, releases{0};
    int result = 0;

protected:
    int initialize_l() override {
        enter(inits);
        return result;
    }
    void release_l() override { enter(releases); }

private:
    void enter(std::atomic<int>& counter) {
        if (inside.fetch_add(1) != 0) overlaps++;
        counter++;
        // Widen the window in which an unserialised call would overlap.
        for (int i = 0; i < 200; i++) std::this_thread::yield();
        inside.fetch_sub(1);
    }
};

TEST(EglObjectTest, InitializeAndReleaseAreSerialisedAndPassResultsOn) {
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
    // initialize() hands back what the subclass returned.
    probe->result = -7;
    EXPECT_EQ(probe->initialize(), -7);
    EXPECT_EQ(probe->onDrawFrame(), 0);
}

}  // namespace
