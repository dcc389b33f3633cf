// Listing the served effects and resolving -e arguments.
#include <android/log.h>
#include <gtest/gtest.h>

#include "core/KivImaging.h"
#include "effects.h"
#include "support/log_capture.h"
#include "vccore/vc_log.h"

namespace {

using namespace kivcli;

// Asking the factory about every id logs a great deal; keep the output short.
class Effects : public ::testing::Test {
protected:
    void SetUp() override { __android_log_set_minimum_priority(ANDROID_LOG_WARN); }
    LogCapture mQuiet;
};

TEST_F(Effects, ListMatchesTheFactory) {
    std::vector<EffectInfo> list = effectList();
    ASSERT_FALSE(list.empty());
    int previous = -1;
    bool sawNoEffect = false;
    for (const EffectInfo& e : list) {
        EXPECT_GT(e.id, previous) << "ids in ascending order, each once";
        previous = e.id;
        bool inRange = (e.id >= 200 && e.id <= 213) || (e.id >= 400 && e.id <= 447) ||
                       (e.id >= 500 && e.id <= 508);
        EXPECT_TRUE(inRange) << e.id;
        EXPECT_FALSE(e.className.empty()) << e.id;
        EXPECT_EQ(std::string::npos, e.className.find("::")) << e.className;
        KivFilter* f = KivImaging_create(e.id, nullptr);
        ASSERT_NE(nullptr, f) << e.id;
        EXPECT_EQ(f->getFilterType(), e.filterType);
        EXPECT_EQ(KivImaging_getOptionsCount(f), static_cast<int>(e.options.size())) << e.id;
        KivImaging_destroy(f);
        sawNoEffect |= e.id == 400 && e.className == "NoEffect" && e.filterType == 400;
    }
    EXPECT_TRUE(sawNoEffect);
    // And nothing the factory serves below the downloadable filter is missing.
    size_t served = 0;
    for (int id = 0; id < 1000; id++) {
        KivFilter* f = KivImaging_create(id, nullptr);
        served += f != nullptr;
        KivImaging_destroy(f);
    }
    EXPECT_EQ(served, list.size());
}

TEST_F(Effects, ResolvesIdsAndNames) {
    KivFilter* f = KivImaging_create(403, nullptr);
    EXPECT_EQ("Negative", effectClassName(f));
    KivImaging_destroy(f);
    EXPECT_EQ("", effectClassName(nullptr));

    EffectChoice c;
    std::string error;
    ASSERT_TRUE(effectResolve("403", &c, &error)) << error;
    EXPECT_EQ(403, c.id);
    EXPECT_EQ("403 Negative", c.label);
    EXPECT_TRUE(c.library.empty());

    ASSERT_TRUE(effectResolve("sEpIa", &c, &error)) << error;
    EXPECT_EQ(401, c.id);
    EXPECT_EQ("401 Sepia", c.label);

    struct Bad {
        const char* arg;
        const char* message;
    } bad[] = {
        {"404", "no effect has id 404 (see 'kivimaging effects')"},
        {"2000", "no effect has id 2000 (see 'kivimaging effects')"},
        {"Sepiaa", "unknown effect 'Sepiaa' (see 'kivimaging effects')"},
        {"", "empty effect name"},
    };
    for (const Bad& b : bad) {
        error.clear();
        EXPECT_FALSE(effectResolve(b.arg, &c, &error)) << b.arg;
        EXPECT_EQ(b.message, error);
    }
    // A filter-library name the catalog maps to a built-in effect is handed to
    // the processor by name.
    const char* film = "com.morvane.android.provider.filterprovider,libfilm.so";
    ASSERT_TRUE(effectResolve(film, &c, &error)) << error;
    EXPECT_EQ(-1, c.id);
    EXPECT_EQ(film, c.library);
    EXPECT_EQ(film, c.label);
}

}  // namespace
