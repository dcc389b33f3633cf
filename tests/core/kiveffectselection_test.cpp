// Selecting an effect by name: already-loaded checks, downloadable fallback,
// pass-through fallback, and the detach-then-delete order.
#include <gtest/gtest.h>

#include <utils/StrongPointer.h>

#include <string>
#include <vector>

#include "core/KivBuiltInFilterCatalog.h"
#include "core/KivEffectSelection.h"
#include "support/log_capture.h"
#include "test_effects.h"
#include "vccore/vc_log.h"

namespace {

const char kFilm[] = "com.morvane.android.provider.filterprovider,libfilm.so";
const char kDownloaded[] = "com.example.shop,libsparkle.so";

// Stands in for the factory so that the test controls which ids succeed.
struct FakeFactory {
    std::vector<int> requested;
    std::vector<std::string> names;
    std::vector<int> failing;

    KivEffectCreate creator() {
        return [this](int id, void* arg) -> KivFilter* {
            requested.push_back(id);
            names.push_back(arg != nullptr ? static_cast<const char*>(arg) : "");
            for (int f : failing) {
                if (f == id) return nullptr;
            }
            // A downloadable filter reports its name with a suffix of its own.
            if (id == 2000) {
                return new ProbeEffect(2000, kDownloadedWithSuffix);
            }
            return new ProbeEffect(id);
        };
    }
    static constexpr const char* kDownloadedWithSuffix = "com.example.shop,libsparkle.so#v2";
};

struct Detacher {
    std::vector<KivFilter*> detached;
    std::vector<int> liveAtDetach;
    KivEffectDetach fn() {
        return [this](KivFilter* f) {
            detached.push_back(f);
            liveAtDetach.push_back(ProbeEffect::sLive);  // still alive when detached
        };
    }
};

class KivEffectSelectionTest : public ::testing::Test {
protected:
    android::sp<KivBuiltInFilterCatalog> catalog = new KivBuiltInFilterCatalog(0);
    FakeFactory factory;
    Detacher detacher;
    LogCapture log;
};

TEST_F(KivEffectSelectionTest, CataloguedNameKeepsOrReplaces) {
    int status = 99;
    // Nothing loaded: the catalogued id is created.
    KivFilter* effect = KivSelectEffectByName(*catalog, nullptr, kFilm, detacher.fn(), &status,
                                              KIV_SELECT_REUSE_LOADED, factory.creator());
    ASSERT_NE(effect, nullptr);
    EXPECT_EQ(status, 0);
    EXPECT_EQ(effect->getFilterType(), 501);
    EXPECT_TRUE(detacher.detached.empty());

    // Same name again: kept, with the exact line, nothing detached or built.
    status = 99;
    KivFilter* again = KivSelectEffectByName(*catalog, effect, kFilm, detacher.fn(), &status,
                                             KIV_SELECT_REUSE_LOADED, factory.creator());
    EXPECT_EQ(again, effect);
    EXPECT_EQ(status, 0);
    EXPECT_TRUE(
        log.contains(VF_LOG_ERROR, std::string("The effect is already loaded. filename = ") +
                                       kFilm + ", getFilterType() = 501"));
    EXPECT_EQ(factory.requested.size(), 1u);
    EXPECT_TRUE(detacher.detached.empty());

    // Another catalogued name: the old effect is detached while alive, then deleted.
    int live = ProbeEffect::sLive;
    KivFilter* vivid = KivSelectEffectByName(
        *catalog, effect, "com.morvane.android.provider.filterprovider,libvivid.so", detacher.fn(),
        &status, KIV_SELECT_REUSE_LOADED, factory.creator());
    ASSERT_NE(vivid, nullptr);
    EXPECT_EQ(vivid->getFilterType(), 502);
    ASSERT_EQ(detacher.detached.size(), 1u);
    EXPECT_EQ(detacher.detached[0], effect);
    EXPECT_EQ(detacher.liveAtDetach[0], live);
    EXPECT_EQ(ProbeEffect::sLive, live);  // one gone, one made
    delete vivid;
}

TEST_F(KivEffectSelectionTest, ReportedTypeDecidesNotTheClass) {
    // An effect reporting 432 is "already" whatever is catalogued as 432 …
    ASSERT_TRUE(catalog->addBuiltInFilter("vendor,libwarm.so", 432));
    ASSERT_TRUE(catalog->addBuiltInFilter("vendor,libbright.so", 431));
    KivFilter* brightness = new ProbeEffect(432);
    KivFilter* kept =
        KivSelectEffectByName(*catalog, brightness, "vendor,libwarm.so", detacher.fn(), nullptr,
                              KIV_SELECT_REUSE_LOADED, factory.creator());
    EXPECT_EQ(kept, brightness);
    // … and never what is catalogued as 431.
    KivFilter* rebuilt =
        KivSelectEffectByName(*catalog, brightness, "vendor,libbright.so", detacher.fn(), nullptr,
                              KIV_SELECT_REUSE_LOADED, factory.creator());
    // (The new effect may reuse the old one's address, so count calls instead.)
    ASSERT_NE(rebuilt, nullptr);
    EXPECT_EQ(factory.requested, std::vector<int>{431});
    EXPECT_EQ(detacher.detached.size(), 1u);
    EXPECT_EQ(rebuilt->getFilterType(), 431);
    delete rebuilt;
}

TEST_F(KivEffectSelectionTest, UnknownNameGoesDownloadableThenFallback) {
    int status = 99;
    KivFilter* effect = KivSelectEffectByName(*catalog, nullptr, kDownloaded, detacher.fn(),
                                              &status, KIV_SELECT_REUSE_LOADED, factory.creator());
    ASSERT_NE(effect, nullptr);
    EXPECT_EQ(status, 0);
    ASSERT_EQ(factory.requested, std::vector<int>{2000});
    EXPECT_EQ(factory.names[0], kDownloaded);

    // Its package-and-file name starts with the request: kept.
    KivFilter* kept = KivSelectEffectByName(*catalog, effect, kDownloaded, detacher.fn(), &status,
                                            KIV_SELECT_REUSE_LOADED, factory.creator());
    EXPECT_EQ(kept, effect);
    EXPECT_TRUE(log.contains(
        VF_LOG_ERROR, std::string("The effect is already loaded. filename = ") + kDownloaded +
                          ", getPkgAndName() = " + FakeFactory::kDownloadedWithSuffix));
    // A longer name than the loaded one, or a different one, is not a prefix match.
    factory.failing = {2000};
    KivFilter* fallback =
        KivSelectEffectByName(*catalog, effect, "com.example.shop,libsparkle.so#v2-extra",
                              detacher.fn(), &status, KIV_SELECT_REUSE_LOADED, factory.creator());
    ASSERT_NE(fallback, nullptr);
    EXPECT_EQ(status, 0);
    EXPECT_EQ(fallback->getFilterType(), 400);
    EXPECT_EQ(factory.requested, (std::vector<int>{2000, 2000, 400}));
    ASSERT_EQ(detacher.detached.size(), 1u);
    EXPECT_EQ(detacher.detached[0], effect);
    delete fallback;
}

TEST_F(KivEffectSelectionTest, CataloguedFailureFallsBackAndNothingLeft) {
    factory.failing = {503};
    KivFilter* current = new ProbeEffect(401);
    int status = 99;
    KivFilter* effect = KivSelectEffectByName(
        *catalog, current, "com.morvane.android.provider.filterprovider,libcalm.so", detacher.fn(),
        &status, KIV_SELECT_REUSE_LOADED, factory.creator());
    ASSERT_NE(effect, nullptr);
    EXPECT_EQ(effect->getFilterType(), 400);
    EXPECT_EQ(factory.requested, (std::vector<int>{503, 400}));

    // Not even the pass-through effect: null, an error status, current gone.
    factory.failing = {503, 400};
    int live = ProbeEffect::sLive;
    KivFilter* none = KivSelectEffectByName(
        *catalog, effect, "com.morvane.android.provider.filterprovider,libcalm.so", detacher.fn(),
        &status, KIV_SELECT_REUSE_LOADED, factory.creator());
    EXPECT_EQ(none, nullptr);
    EXPECT_EQ(status, VC_ERROR_UNKNOWN);
    EXPECT_EQ(ProbeEffect::sLive, live - 1);
}

TEST_F(KivEffectSelectionTest, AlwaysNewModeAndNullName) {
    KivFilter* current = new ProbeEffect(501);
    KivFilter* fresh = KivSelectEffectByName(*catalog, current, kFilm, detacher.fn(), nullptr,
                                             KIV_SELECT_ALWAYS_NEW, factory.creator());
    ASSERT_NE(fresh, nullptr);
    EXPECT_EQ(fresh->getFilterType(), 501);
    EXPECT_EQ(factory.requested, std::vector<int>{501});
    ASSERT_EQ(detacher.detached.size(), 1u);
    EXPECT_EQ(detacher.detached[0], current);

    int status = 99;
    KivFilter* same = KivSelectEffectByName(*catalog, fresh, nullptr, detacher.fn(), &status,
                                            KIV_SELECT_REUSE_LOADED, factory.creator());
    EXPECT_EQ(same, fresh);
    EXPECT_EQ(status, VC_ERROR_NULL_PARAM);
    EXPECT_EQ(detacher.detached.size(), 1u);
    delete fresh;

    // Without a creator hook the real factory is asked (and logs the request).
    log.clear();
    KivFilter* real = KivSelectEffectByName(*catalog, nullptr, kFilm, nullptr, nullptr);
    EXPECT_TRUE(log.contains(VF_LOG_DEBUG, "Trying to instantiate effect 501"));
    EXPECT_TRUE(log.contains(VF_LOG_DEBUG, "Trying to instantiate effect 400"));
    delete real;
}

}  // namespace
