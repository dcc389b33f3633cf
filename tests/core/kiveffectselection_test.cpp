// Selecting an effect by name: already-loaded checks, downloadable and
// pass-through fallbacks, detach before delete.
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

const std::string kFilm = "com.morvane.android.provider.filterprovider,libfilm.so";
const std::string kCalm = "com.morvane.android.provider.filterprovider,libcalm.so";
const char kShop[] = "com.example.shop,libsparkle.so";
// A downloadable filter may report more than the name it was asked for.
const char kShopLoaded[] = "com.example.shop,libsparkle.so#v2";

class KivEffectSelectionTest : public ::testing::Test {
protected:
    // The test decides which ids build; effects may reuse freed addresses, so
    // results are judged by these records rather than by pointer identity.
    KivFilter* select(KivFilter* current, const char* name,
                      KivEffectSelectMode mode = KIV_SELECT_REUSE_LOADED) {
        return KivSelectEffectByName(
            *catalog, current, name,
            [this](KivFilter* f) {
                detached.push_back(f);
                liveAtDetach.push_back(ProbeEffect::sLive);
            },
            &status, mode,
            [this](int id, void* arg) -> KivFilter* {
                requested.push_back(id);
                for (int bad : failing) {
                    if (bad == id) return nullptr;
                }
                if (id == 2000) {
                    EXPECT_STREQ(static_cast<const char*>(arg), lastName.c_str());
                    return new ProbeEffect(2000, kShopLoaded);
                }
                return new ProbeEffect(id);
            });
    }

    android::sp<KivBuiltInFilterCatalog> catalog = new KivBuiltInFilterCatalog(0);
    std::vector<int> requested, failing, liveAtDetach;
    std::vector<KivFilter*> detached;
    std::string lastName;
    int status = 99;
    LogCapture log;
};

TEST_F(KivEffectSelectionTest, CataloguedNames) {
    KivFilter* effect = select(nullptr, kFilm.c_str());
    ASSERT_NE(effect, nullptr);
    EXPECT_EQ(status, 0);
    EXPECT_EQ(effect->getFilterType(), 501);

    // Same name again: kept, with the exact line; nothing built or detached.
    EXPECT_EQ(select(effect, kFilm.c_str()), effect);
    EXPECT_TRUE(log.contains(VF_LOG_ERROR, "The effect is already loaded. filename = " + kFilm +
                                               ", getFilterType() = 501"));
    EXPECT_EQ(requested, std::vector<int>{501});
    EXPECT_TRUE(detached.empty());

    // The reported type decides: 432 counts as loaded for a row of 432 …
    ASSERT_TRUE(catalog->addBuiltInFilter("v,libwarm.so", 432));
    ASSERT_TRUE(catalog->addBuiltInFilter("v,libbright.so", 431));
    KivFilter* brightness = new ProbeEffect(432);
    EXPECT_EQ(select(brightness, "v,libwarm.so"), brightness);
    // … never for a row of 431; the old effect is detached while still alive.
    int live = ProbeEffect::sLive;
    KivFilter* rebuilt = select(brightness, "v,libbright.so");
    ASSERT_EQ(detached, std::vector<KivFilter*>{brightness});
    EXPECT_EQ(liveAtDetach[0], live);
    EXPECT_EQ(rebuilt->getFilterType(), 431);
    EXPECT_EQ(ProbeEffect::sLive, live);  // one deleted, one made

    // A failing id falls back to 400; with 400 failing too: null and -1.
    failing = {503};
    KivFilter* fallback = select(rebuilt, kCalm.c_str());
    ASSERT_NE(fallback, nullptr);
    EXPECT_EQ(fallback->getFilterType(), 400);
    failing = {503, 400};
    EXPECT_EQ(select(fallback, kCalm.c_str()), nullptr);
    EXPECT_EQ(status, VC_ERROR_UNKNOWN);
    EXPECT_EQ(ProbeEffect::sLive, live - 1);
    EXPECT_EQ(requested, (std::vector<int>{501, 431, 503, 400, 503, 400}));
    delete effect;
}

TEST_F(KivEffectSelectionTest, UnknownNamesAreDownloadable) {
    lastName = kShop;
    KivFilter* effect = select(nullptr, kShop);
    ASSERT_NE(effect, nullptr);
    EXPECT_EQ(requested, std::vector<int>{2000});

    // The loaded filter's name starts with the request: kept.
    EXPECT_EQ(select(effect, kShop), effect);
    EXPECT_TRUE(
        log.contains(VF_LOG_ERROR, std::string("The effect is already loaded. filename = ") +
                                       kShop + ", getPkgAndName() = " + kShopLoaded));
    // A request longer than the loaded name is no prefix of it.
    lastName = std::string(kShopLoaded) + "-extra";
    failing = {2000};
    KivFilter* fallback = select(effect, lastName.c_str());
    ASSERT_NE(fallback, nullptr);
    EXPECT_EQ(fallback->getFilterType(), 400);
    EXPECT_EQ(requested, (std::vector<int>{2000, 2000, 400}));
    EXPECT_EQ(detached.size(), 1u);
    delete fallback;
}

TEST_F(KivEffectSelectionTest, AlwaysNewNullNameAndRealFactory) {
    KivFilter* current = new ProbeEffect(501);
    KivFilter* fresh = select(current, kFilm.c_str(), KIV_SELECT_ALWAYS_NEW);
    EXPECT_EQ(detached, std::vector<KivFilter*>{current});
    EXPECT_EQ(requested, std::vector<int>{501});

    EXPECT_EQ(select(fresh, nullptr), fresh);
    EXPECT_EQ(status, VC_ERROR_NULL_PARAM);
    EXPECT_EQ(detached.size(), 1u);
    delete fresh;

    // Without a creator the factory is asked; a curve look it cannot build
    // yet becomes the pass-through effect.
    log.clear();
    KivFilter* real = KivSelectEffectByName(*catalog, nullptr, kFilm.c_str(), nullptr);
    EXPECT_TRUE(log.contains(VF_LOG_DEBUG, "Trying to instantiate effect 501"));
    ASSERT_NE(real, nullptr);
    if (real->getFilterType() != 501) {
        EXPECT_EQ(real->getFilterType(), 400);
        EXPECT_TRUE(log.contains(VF_LOG_DEBUG, "Trying to instantiate effect 400"));
    }
    delete real;
}

}  // namespace
