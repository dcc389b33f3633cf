// The shared option pattern end to end. The registry is process-wide, so keys
// are compared with each other, never with constants.
#include <gtest/gtest.h>

#include "core/KivImaging.h"
#include "support/log_capture.h"
#include "test_effects.h"

namespace {

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

}  // namespace
