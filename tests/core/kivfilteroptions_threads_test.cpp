// kiv-test-labels: threads
// First constructions of an effect class racing on several threads: the
// registry is not locked, so the class's one-time guard alone must keep the
// registration single.
#include <gtest/gtest.h>

#include <atomic>
#include <thread>
#include <vector>

#include "core/KivFilterOptions.h"
#include "support/log_capture.h"
#include "test_effects.h"

namespace {

class RacedEffect : public KivFilterWithOptions<RacedEffect, ProbeEffect> {
public:
    static KivFilterOptionTable& optionTable() {
        static VCOption_t records[] = {KivOption_int("kivtest_raced_a", 0, 9),
                                       KivOption_string("kivtest_raced_b")};
        static KivFilterOptionTable table(records);
        return table;
    }
};

TEST(KivFilterOptionsThreads, ConcurrentFirstUseRegistersOnce) {
    LogCapture log;
    std::atomic<bool> go{false};
    std::vector<std::thread> threads;
    std::vector<int> counts(8, -1);
    for (int i = 0; i < 8; ++i) {
        threads.emplace_back([&go, &counts, i] {
            while (!go.load()) std::this_thread::yield();
            RacedEffect effect;
            counts[i] = effect.getOptionsCount();
        });
    }
    go = true;
    for (std::thread& t : threads) t.join();
    for (int c : counts) EXPECT_EQ(c, 2);
    EXPECT_EQ(log.countPrefix("DEBUG: Registering option 'kivtest_raced_a'"), 1u);
    EXPECT_EQ(log.countPrefix("DEBUG: Registering option 'kivtest_raced_b'"), 1u);
    const VCOption_t* const* options = RacedEffect::optionTable().options();
    EXPECT_EQ(VCOption_FindIdByName("kivtest_raced_a"), options[0]->key);
    EXPECT_EQ(VCOption_FindIdByName("kivtest_raced_b"), options[1]->key);
    EXPECT_NE(options[0]->key, options[1]->key);
}

}  // namespace
