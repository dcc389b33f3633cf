// Effects below the GPU: the base class through the C API and the callback
// relay, the factory and its table, the built-in filter catalog, the shared
// option pattern and selecting an effect by name.
#include <gtest/gtest.h>
#include <utils/StrongPointer.h>

#include <functional>
#include <map>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "core/KivBuiltInFilterCatalog.h"
#include "core/KivEffectSelection.h"
#include "core/KivFilter.h"
#include "core/KivFilterFactory.h"
#include "core/KivImaging.h"
#include "support/image_ptr.h"
#include "support/log_capture.h"
#include "test_effects.h"
#include "vccore/vc_log.h"

extern "C" int kivtest_c_null_handles(void);

namespace {

TEST(KivFilter, Values) {
    ProbeEffect effect(431);
    KivFilter* f = &effect;
    EXPECT_EQ(KivImaging_getValue(f, 102, -9), -9);  // no input yet
    EXPECT_EQ(KivImaging_getValue(f, 105, -9), 431);
    std::vector<unsigned char> pixels(6 * 4 * 4);
    ASSERT_EQ(KivImaging_setInputImage(f, pixels.data(), 6, 4, VC_FORMAT_RGBA, 0), 0);
    EXPECT_EQ(std::vector<int>({6, 4, static_cast<int>(VC_FORMAT_RGBA)}),
              std::vector<int>({KivImaging_getValue(f, 102, -9), KivImaging_getValue(f, 103, -9),
                                KivImaging_getValue(f, 104, -9)}));
    for (int id = 106; id <= 110; ++id) EXPECT_EQ(KivImaging_getValue(f, id, 55), 55) << id;
    for (int id : {102, 105, 106, 110, 112})
        EXPECT_EQ(KivImaging_setValue(f, id, 1), VC_ERROR_INVALID_PARAM) << id;
    // The flag takes 0 and 1 only; the test is unsigned, so -1 fails too.
    EXPECT_EQ(KivImaging_getValue(f, 111, 7), 0);
    for (int bad : {2, -1}) EXPECT_EQ(KivImaging_setValue(f, 111, bad), VC_ERROR_INVALID_PARAM);
    EXPECT_EQ(KivImaging_setValue(f, 111, 1), 0);
    EXPECT_EQ(KivImaging_getValue(f, 111, 7), 1);
    effect.valueFlagSupported = false;
    EXPECT_EQ(KivImaging_setValue(f, 111, 0), VC_ERROR_INVALID_PARAM);
    EXPECT_EQ(KivImaging_getValue(f, 111, 7), 7);
    ProbeEffect untyped(-1), tracking(static_cast<int>(0xB16B00B5u));
    EXPECT_EQ(KivImaging_getValue(&untyped, 105, 12), 12);
    EXPECT_EQ(KivImaging_getValue(&tracking, 105, 12), -1318387531);
}

TEST(KivFilter, ImageReplacement) {
    ProbeEffect effect;
    KivFilter* f = &effect;
    unsigned char a[64] = {0}, b[64] = {0}, out[64] = {0};
    ASSERT_EQ(KivImaging_setInputImage(f, a, 4, 4, VC_FORMAT_RGBA, 21), 0);
    // A wrapper: caller's pointer, not owned, size unknown, extra in the last field.
    ASSERT_NE(effect.inputImage(), nullptr);
    EXPECT_EQ(effect.inputImage()->data, a);
    EXPECT_EQ("4x4 RGBA wrapped 1 size 0 uv 21", VCImageTest_record(effect.inputImage()));
    // Same shape, other buffer: not a change, but the set hook runs; width,
    // height and format each count as a change.
    const struct {
        unsigned char* data;
        int w, h;
        uint32_t format;
        int changes, sets;
    } steps[] = {{b, 4, 4, VC_FORMAT_RGBA, 1, 2},       {b, 2, 8, VC_FORMAT_RGBA, 2, 3},
                 {b, 2, 4, VC_FORMAT_RGBA, 3, 4},       {b, 2, 4, VC_FORMAT_BGRA, 4, 5},
                 {nullptr, 2, 4, VC_FORMAT_BGRA, 4, 5},  // clears the input without hooks
                 {b, 2, 4, VC_FORMAT_BGRA, 5, 6}};       // so the next one is a change
    for (const auto& s : steps) {
        ASSERT_EQ(KivImaging_setInputImage(f, s.data, s.w, s.h, s.format, 0), 0);
        EXPECT_EQ(s.changes * 10 + s.sets, effect.formatChangedCalls * 10 + effect.inputSetCalls);
        EXPECT_EQ(s.data == nullptr, effect.inputImage() == nullptr);
    }
    // A rejected format drops the input that was there.
    effect.rejectedFormat = static_cast<int>(VC_FORMAT_NV21);
    EXPECT_EQ(KivImaging_setInputImage(f, a, 4, 4, VC_FORMAT_NV21, 0), VC_ERROR_UNSUPPORTED);
    EXPECT_EQ(effect.inputImage(), nullptr);
    EXPECT_EQ(KivImaging_supportsInputFormat(f, static_cast<int>(VC_FORMAT_NV21)), 0);
    // Outputs: any shape without input; a mismatch is -4 but the wrapper stays.
    EXPECT_EQ(KivImaging_setOutputImage(f, out, 3, 3, VC_FORMAT_RGBA, 5), 0);
    EXPECT_EQ(effect.outputImage()->uvOffset, 5u);
    ASSERT_EQ(KivImaging_setInputImage(f, a, 4, 4, VC_FORMAT_RGBA, 0), 0);
    EXPECT_EQ(KivImaging_setOutputImage(f, out, 4, 4, VC_FORMAT_RGBA, 0), 0);
    EXPECT_EQ(KivImaging_setOutputImage(f, out, 4, 2, VC_FORMAT_RGBA, 0), VC_ERROR_INVALID_SIZE);
    EXPECT_EQ("4x2 RGBA wrapped 1 size 0 uv 0", VCImageTest_record(effect.outputImage()));
    EXPECT_EQ(KivImaging_setOutputImage(f, out, 4, 4, VC_FORMAT_BGRA, 0), VC_ERROR_INVALID_SIZE);
    EXPECT_EQ(KivImaging_setOutputImage(f, nullptr, 4, 4, VC_FORMAT_RGBA, 0), 0);
    EXPECT_EQ(effect.outputImage(), nullptr);
}

// Destroyed through the C API at the end: under ASan a leaked record or a
// freed caller buffer fails here.
TEST(KivFilter, WorkImageLifecycle) {
    ProbeEffect* effect = new ProbeEffect();
    KivFilter* f = effect;
    std::vector<unsigned char> pixels(8 * 8 * 4, 0x5a);
    EXPECT_EQ(KivImaging_init(f), VC_ERROR_UNKNOWN);  // no input yet
    ASSERT_EQ(KivImaging_setInputImage(f, pixels.data(), 8, 4, VC_FORMAT_RGBA, 0), 0);
    ASSERT_EQ(KivImaging_init(f), 0);
    const VCImage* work = effect->workImage();
    ASSERT_NE(work, nullptr);
    EXPECT_EQ("8x4 RGBA wrapped 0 size 128 uv 0", VCImageTest_record(work));
    EXPECT_EQ(effect->workChangedCalls, 1);
    unsigned char* buffer = work->data;
    // Same byte count, other shape and format: relabelled, effect not told.
    ASSERT_EQ(KivImaging_setInputImage(f, pixels.data(), 4, 8, VC_FORMAT_BGRA, 0), 0);
    ASSERT_EQ(KivImaging_init(f), 0);
    ASSERT_EQ(effect->workImage(), work);
    EXPECT_EQ(work->data, buffer);
    EXPECT_EQ("4x8 BGRA wrapped 0 size 128 uv 0", VCImageTest_record(work));
    EXPECT_EQ(effect->workChangedCalls, 1);
    // Other byte count: a new buffer of the input's size (4x4 at 12 bits a pixel).
    ASSERT_EQ(KivImaging_setInputImage(f, pixels.data(), 4, 4, VC_FORMAT_NV21, 0), 0);
    ASSERT_EQ(KivImaging_init(f), 0);
    EXPECT_EQ(VCImage_size(effect->workImage()), 24u);
    EXPECT_EQ(effect->workChangedCalls, 2);
    // release() frees only the working image, and says so.
    EXPECT_EQ(KivImaging_release(f), 0);
    EXPECT_EQ(effect->workImage(), nullptr);
    EXPECT_EQ(effect->workChangedCalls, 3);
    EXPECT_NE(effect->inputImage(), nullptr);
    // An effect that wants no working image drops the one it had.
    ASSERT_EQ(KivImaging_init(f), 0);
    effect->wantsWorkImage = false;
    EXPECT_EQ(KivImaging_init(f), 0);
    EXPECT_EQ(effect->workImage(), nullptr);
    // An input whose byte size is unknown cannot get a working image; the old
    // buffer is gone, not left dangling.
    effect->wantsWorkImage = true;
    ASSERT_EQ(KivImaging_setInputImage(f, pixels.data(), 4, 4, 0x12345678, 0), 0);
    EXPECT_EQ(KivImaging_init(f), VC_ERROR_ALLOC_FAILED);
    EXPECT_EQ(effect->workImage(), nullptr);
    ASSERT_EQ(KivImaging_setOutputImage(f, pixels.data(), 4, 4, 0x12345678, 0), 0);
    ASSERT_EQ(KivImaging_init(f), VC_ERROR_ALLOC_FAILED);
    const int live = ProbeEffect::sLive;
    KivImaging_destroy(f);
    EXPECT_EQ(ProbeEffect::sLive, live - 1);
    EXPECT_EQ(std::vector<unsigned char>(8 * 8 * 4, 0x5a), pixels);
}

TEST(KivImagingCApi, NullHandlesFromC) {
    LogCapture log;  // keeps the factory's debug lines out of the output
    EXPECT_EQ(kivtest_c_null_handles(), 0) << "failed check at kivimaging_c_api.c line shown";
}

void clientCallback(const char* message, void* context) {
    static_cast<std::vector<std::string>*>(context)->push_back(message);
}

TEST(KivImagingHandle, CallbackRelaysWithClientContext) {
    ProbeEffect effect;
    std::vector<std::string> received;
    // No filter: nothing stored, so nothing can be relayed later.
    KivImaging empty;
    empty.kivImagingSetCallback(clientCallback, &received);
    empty.setFilter(&effect);
    effect.report("dropped");
    // The client sees its own context (the vector), not the relay's.
    KivImaging imaging(&effect);
    imaging.kivImagingSetCallback(clientCallback, &received);
    effect.report("face found");
    effect.report("face lost");
    // A null client callback silences the relay without crashing.
    imaging.kivImagingSetCallback(nullptr, &received);
    effect.report("ignored");
    EXPECT_EQ(std::vector<std::string>({"face found", "face lost"}), received);
}

// Every line and status of the effect base and the option pattern.
TEST(CoreLog, LinesAndStatuses) {
    ProbeEffect effect;
    TwoOptionEffect options;
    const int unknown = static_cast<int>(VCOPTION_KEY_BASE);  // never handed out
    unsigned char pixels[64];
    const std::string kUnknownId = "E Option not found: " + std::to_string(unknown);
    LogCapture_expectRows({
        {[&] { return KivImaging_init(&effect); },
         -1,
         {"E VC_ERROR_UNKNOWN (-1): core/KivFilter:#"}},
        {[&] {
             effect.rejectedFormat = static_cast<int>(VC_FORMAT_NV21);
             return KivImaging_setInputImage(&effect, pixels, 4, 4, VC_FORMAT_NV21, 0);
         },
         -6,
         {"E VC_ERROR_UNSUPPORTED (-6): core/KivFilter:#"}},
        {[&] {
             KivImaging_setInputImage(&effect, pixels, 4, 4, 0x12345678, 0);
             return KivImaging_init(&effect);
         },
         -5,
         {"E VC_ERROR_ALLOC_FAILED (-5): core/KivFilter:#"}},
        {[&] { return KivImaging_setOptionByIdI(&options, unknown, 1); }, 0, {kUnknownId}},
        {[&] { return KivImaging_setOptionByIdF(&options, unknown, 1.0f); }, 0, {kUnknownId}},
        {[&] { return KivImaging_setOptionByIdS(&options, unknown, "intensity=0"); },
         0,
         {kUnknownId}},
        {[&] { return KivImaging_getOptionById(&options, unknown).type; }, 4, {kUnknownId}},
        {[&] { return KivImaging_setOptionByIdI(&options, -5, 1); }, 0, {"E Option not found: -5"}},
    });
    EXPECT_EQ(0, options.level);  // unknown ids changed nothing
    EXPECT_FLOAT_EQ(-1.0f, options.intensity);
}

// The effect factory: ids without an effect yield null, served ids report the
// agreed type, and the table mechanics work for ranges and other builders.
TEST(KivFilterFactory, UnservedIdsYieldNullAndServedIdsReportTheirType) {
    LogCapture quiet;
    for (int id : {-1,  0,   199, 203, 205, 207, 211, 214, 399, 404, 405,  407, 409,
                   413, 418, 421, 423, 424, 437, 439, 448, 499, 509, 1999, 2001})
        EXPECT_EQ(std::unique_ptr<KivFilter>(KivFilter::create(id, nullptr)), nullptr) << id;
    // Served effects report their id, except these on purpose (processors
    // compare the reported type with a requested id), and start without images.
    const std::map<int, int> quirks = {{212, -1318387531 /* 0xB16B00B5 */}, {431, 432}, {435, 425}};
    int served = 0;
    for (int id = 0; id < 1000; ++id) {
        std::unique_ptr<KivFilter> f(KivFilterFactory::create(id, nullptr));
        if (!f) continue;
        ++served;
        EXPECT_EQ(f->getFilterType(), quirks.count(id) ? quirks.at(id) : id) << "id " << id;
        EXPECT_EQ(f->getValue(102, -7), -7) << "id " << id;
    }
    EXPECT_GT(served, 0);  // at least the pass-through look every processor falls back to
}

class NamedProbe : public ProbeEffect {
public:
    explicit NamedProbe(const char* name) : ProbeEffect(2000, name) {}
};
class MismatchedProbe : public ProbeEffect {
public:
    MismatchedProbe() : ProbeEffect(432) {}
};

TEST(KivFilterFactory, TableMechanics) {
    const KivFilterFactory::Entry table[] = {
        {431, 431, KivFilterFactory::make<MismatchedProbe>},  // reports 432
        {500, 508, KivFilterFactory::makeWithId<ProbeEffect>},
        {2000, 2000, KivFilterFactory::makeWithName<NamedProbe>},
        {500, 500, KivFilterFactory::make<MismatchedProbe>},  // shadowed by the range
        {600, 600, nullptr},                                  // no builder: serves nothing
    };
    const size_t n = sizeof(table) / sizeof(table[0]);
    std::unique_ptr<KivFilter> f(KivFilterFactory::createFrom(table, n, 431, nullptr));
    ASSERT_NE(f, nullptr);
    EXPECT_EQ(f->getFilterType(), 432);
    for (int id : {500, 504, 508}) {
        f.reset(KivFilterFactory::createFrom(table, n, id, nullptr));
        ASSERT_NE(f, nullptr) << id;
        EXPECT_EQ(f->getFilterType(), id);
    }
    for (int id : {430, 499, 509, 600}) {
        EXPECT_EQ(KivFilterFactory::createFrom(table, n, id, nullptr), nullptr) << id;
    }
    EXPECT_EQ(KivFilterFactory::createFrom(nullptr, 3, 431, nullptr), nullptr);
    char name[] = "com.example.pkg,libx.so";
    f.reset(KivFilterFactory::createFrom(table, n, 2000, name));
    ASSERT_NE(f, nullptr);
    EXPECT_STREQ(f->getPkgAndFileName(), name);
}

// The built-in filter catalog: the maker's and the vendors' rows, exact
// whole-name matches, insertion and release.
const std::string kMaker = "com.morvane.android.provider.filterprovider";

TEST(KivBuiltInFilterCatalog, MakerAndVendorRows) {
    android::sp<KivBuiltInFilterCatalog> maker = new KivBuiltInFilterCatalog(0);
    android::sp<KivBuiltInFilterCatalog> vendor = new KivBuiltInFilterCatalog(1);
    const char* const makerLibs[] = {"libfilm.so",      "libvivid.so",  "libcalm.so",
                                     "libretro.so",     "libpastel.so", "libgrayscale.so",
                                     "libevergreen.so", "libdawn.so"};
    const char* const vendorLibs[] = {"libriddle.so",   "libdelicious.so", "libgold.so",
                                      "libsweet.so",    "libnostalgia.so", "librose.so",
                                      "libmonogram.so", "libeveryday.so"};
    // Rows 1-2, 3-4, 5-6, 7-8 share a vendor; the maker joins with ',', vendors with '.'.
    const char* const vendors[] = {"alpha", "bravo", "charlie", "delta"};
    EXPECT_EQ(8u, maker->size());
    EXPECT_EQ(8u, vendor->size());
    for (int i = 0; i < 8; ++i) {
        const std::string v = std::string("com.example.filtervendor.") + vendors[i / 2];
        EXPECT_EQ(501 + i, maker->getBuiltInFilterId((kMaker + "," + makerLibs[i]).c_str()));
        EXPECT_EQ(-1, maker->getBuiltInFilterId((kMaker + "." + makerLibs[i]).c_str()));
        EXPECT_EQ(i + 1, vendor->getBuiltInFilterId((v + "." + vendorLibs[i]).c_str()));
        EXPECT_EQ(-1, vendor->getBuiltInFilterId((v + "," + vendorLibs[i]).c_str()));
    }
    EXPECT_EQ(-1, vendor->getBuiltInFilterId((kMaker + ",libfilm.so").c_str()));
    // Exact, case-sensitive, whole-name matches only.
    for (const std::string& near :
         {kMaker + ",libFilm.so", kMaker + ",libfilm", kMaker + ",libfilm.so ",
          std::string("libfilm.so"), std::string()})
        EXPECT_EQ(-1, maker->getBuiltInFilterId(near.c_str())) << near;
    EXPECT_EQ(-1, maker->getBuiltInFilterId(nullptr));
    for (int type : {2, -1})
        EXPECT_EQ(0u,
                  android::sp<KivBuiltInFilterCatalog>(new KivBuiltInFilterCatalog(type))->size());
}

TEST(KivBuiltInFilterCatalog, AddAndRelease) {
    android::sp<KivBuiltInFilterCatalog> catalog = new KivBuiltInFilterCatalog(0);
    EXPECT_FALSE(catalog->addBuiltInFilter(nullptr, 5));
    EXPECT_FALSE(catalog->addBuiltInFilter((kMaker + ",libdawn.so").c_str(), 400));
    EXPECT_EQ(508, catalog->getBuiltInFilterId((kMaker + ",libdawn.so").c_str()));
    // Inserted out of order, all found: the vector stays sorted.
    const std::pair<const char*, int> added[] = {
        {"zz.last", 3}, {"AA.first", 1}, {"m.middle", 2}, {"M.middle", 4}};
    for (const auto& [name, id] : added) EXPECT_TRUE(catalog->addBuiltInFilter(name, id));
    EXPECT_FALSE(catalog->addBuiltInFilter("m.middle", 9));
    EXPECT_EQ(12u, catalog->size());
    for (const auto& [name, id] : added) EXPECT_EQ(id, catalog->getBuiltInFilterId(name));
    EXPECT_EQ(501, catalog->getBuiltInFilterId((kMaker + ",libfilm.so").c_str()));
    catalog->release();
    EXPECT_EQ(0u, catalog->size());
    EXPECT_EQ(BUILT_IN_FILTER_MORVANE, catalog->getType());
    EXPECT_EQ(-1, catalog->getBuiltInFilterId("zz.last"));
    EXPECT_TRUE(catalog->addBuiltInFilter("zz.last", 6));
    EXPECT_EQ(6, catalog->getBuiltInFilterId("zz.last"));
}

// The shared option pattern end to end. The registry is process-wide, so keys
// are compared with each other, never with constants.
// Used by one test only, so its registration can be watched from the start.
class OnceEffect : public KivFilterWithOptions<OnceEffect, ProbeEffect> {
public:
    static KivFilterOptionTable& optionTable() {
        static VCOption_t records[] = {KivOption_float("kivtest_once", 0.0f, 2.0f)};
        static KivFilterOptionTable table(records);
        return table;
    }
};

TEST(KivFilterOptions, RegisteredOncePerProcess) {
    LogCapture log;
    EXPECT_FALSE(OnceEffect::optionTable().isRegistered());
    EXPECT_EQ(VCOption_FindIdByName("kivtest_once"), 0u);
    {
        OnceEffect a, b;
        OnceEffect::VCOPTION_REGISTER();
    }
    OnceEffect c;
    EXPECT_EQ(log.countPrefix("DEBUG: Registering option 'kivtest_once'"), 1u);
    const VCOption_t* record = c.getOptionDesc("kivtest_once");
    ASSERT_NE(record, nullptr);
    EXPECT_EQ(VCOption_FindIdByName("kivtest_once"), record->key);
    EXPECT_EQ(record->max.value.f, 2.0f);
}

TEST(KivFilterOptions, ListsDescriptionsAndSharedKeys) {
    TwoOptionEffect effect, other;
    KivFilter* f = &effect;
    EXPECT_EQ(KivImaging_getOptionsCount(f), 2);
    const char* const* names = KivImaging_listOptionNames(f);
    ASSERT_NE(names, nullptr);
    EXPECT_EQ("parameter kivtest_level", std::string(names[0]) + " " + names[1]);
    EXPECT_EQ(names[2], nullptr);
    const VCOption_t* const* options = KivImaging_listOptions(f);
    ASSERT_NE(options, nullptr);
    EXPECT_EQ(options[2], nullptr);
    EXPECT_EQ(VCOPTION_TYPE_STRING, options[0]->type);
    EXPECT_EQ(VCOPTION_TYPE_STRING, options[0]->min.type);
    EXPECT_EQ(VCOPTION_TYPE_INTEGER, options[1]->type);
    EXPECT_EQ(options[1]->max.value.i, 3);
    EXPECT_NE(options[0]->key, 0u);
    EXPECT_NE(options[0]->key, options[1]->key);
    EXPECT_EQ(KivImaging_getOptionDescById(f, static_cast<int>(options[1]->key)), options[1]);
    EXPECT_EQ(KivImaging_getOptionDescByName(f, "parameter"), options[0]);
    EXPECT_EQ(KivImaging_getOptionDescByName(f, "Parameter"), nullptr);
    EXPECT_EQ(KivImaging_getOptionDescByName(f, nullptr), nullptr);
    EXPECT_EQ(KivImaging_getOptionDescById(f, 0), nullptr);
    EXPECT_EQ(KivImaging_listOptions(&other), options);  // class-wide arrays
    // Another effect's "parameter" STRING record: its own record, the same key.
    OneOptionEffect one;
    const VCOption_t* mine = one.getOptionDesc("parameter");
    ASSERT_NE(mine, nullptr);
    EXPECT_NE(mine, options[0]);
    EXPECT_EQ(mine->key, options[0]->key);
    EXPECT_EQ(one.getOptionDesc(static_cast<int>(options[0]->key)), mine);
    EXPECT_EQ(one.getOptionDesc("kivtest_level"), nullptr);
    EXPECT_EQ(KivImaging_getOptionsCount(&one), 1);
}

TEST(KivFilterOptions, SetAndGetByNameAndId) {
    TwoOptionEffect effect;
    KivFilter* f = &effect;
    const int parameterKey = static_cast<int>(VCOption_FindIdByName("parameter"));
    const int levelKey = static_cast<int>(VCOption_FindIdByName("kivtest_level"));
    ASSERT_TRUE(parameterKey != 0 && levelKey != 0);
    // By name: a parsed key=value string; a missing key is the neutral value.
    EXPECT_EQ(KivImaging_setOptionByNameS(f, "parameter", "mode=2,intensity=0.25"), 1);
    EXPECT_FLOAT_EQ(effect.intensity, 0.25f);
    EXPECT_EQ(KivImaging_setOptionByNameS(f, "parameter", "mode=2"), 1);
    EXPECT_FLOAT_EQ(effect.intensity, 1.0f);
    EXPECT_EQ(KivImaging_setOptionByNameS(f, "parameters", "intensity=0.1"), 0);
    EXPECT_FLOAT_EQ(effect.intensity, 1.0f);
    // By id: resolved to the name, then the by-name setter of that type.
    EXPECT_EQ(KivImaging_setOptionByIdS(f, parameterKey, "intensity=0.75"), 1);
    EXPECT_FLOAT_EQ(effect.intensity, 0.75f);
    EXPECT_EQ(KivImaging_setOptionByIdI(f, levelKey, 3), 1);
    EXPECT_EQ(KivImaging_setOptionByIdI(f, levelKey, 4), 0);     // out of range
    EXPECT_EQ(KivImaging_setOptionByIdF(f, levelKey, 1.0f), 0);  // no float setter
    VCOptionValue_t v = KivImaging_getOptionById(f, levelKey);
    EXPECT_EQ(v.type, VCOPTION_TYPE_INTEGER);
    EXPECT_EQ(v.value.i, 3);
    EXPECT_EQ(KivImaging_getOptionById(f, parameterKey).type, VCOPTION_TYPE_NONE);
}

// Selecting an effect by name: already-loaded checks, downloadable and
// pass-through fallbacks, detach before delete.
const std::string kFilm = kMaker + ",libfilm.so", kCalm = kMaker + ",libcalm.so";
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
