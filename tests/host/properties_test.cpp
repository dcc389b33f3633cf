// Host system properties: the environment mapping, defaults and limits.
#include <cutils/properties.h>

#include <gtest/gtest.h>
#include <stdlib.h>

#include <string>

namespace {

TEST(PropertiesTest, ReadsTheMappedVariableOrTheDefault) {
    char value[PROPERTY_VALUE_MAX];
    unsetenv("KIV_PROP_ro_board_platform");
    EXPECT_EQ(property_get("ro.board.platform", value, ""), 0);
    EXPECT_STREQ(value, "");
    EXPECT_EQ(property_get("ro.board.platform", value, nullptr), 0);
    EXPECT_STREQ(value, "");
    EXPECT_EQ(property_get("ro.board.platform", value, "fallback"), 8);
    EXPECT_STREQ(value, "fallback");

    setenv("KIV_PROP_ro_board_platform", "msm8974", 1);
    EXPECT_EQ(property_get("ro.board.platform", value, "fallback"), 7);
    EXPECT_STREQ(value, "msm8974");
    // Dots become underscores, so this spelling names the same variable.
    EXPECT_EQ(property_get("ro_board_platform", value, "x"), 7);
    EXPECT_EQ(property_get("ro.board.platforms", value, "x"), 1);
    EXPECT_STREQ(value, "x");
    unsetenv("KIV_PROP_ro_board_platform");

    setenv("KIV_PROP_ro_chipname", "", 1);  // empty reads as unset
    EXPECT_EQ(property_get("ro.chipname", value, "dflt"), 4);
    EXPECT_STREQ(value, "dflt");
    unsetenv("KIV_PROP_ro_chipname");
}

TEST(PropertiesTest, LongValuesAreCutAndBadArgumentsAreSafe) {
    char value[PROPERTY_VALUE_MAX];
    setenv("KIV_PROP_test_long", std::string(200, 'a').c_str(), 1);
    EXPECT_EQ(property_get("test.long", value, ""), PROPERTY_VALUE_MAX - 1);
    EXPECT_EQ(std::string(value), std::string(PROPERTY_VALUE_MAX - 1, 'a'));
    unsetenv("KIV_PROP_test_long");

    EXPECT_EQ(property_get(nullptr, value, "d"), 1);
    EXPECT_STREQ(value, "d");
    EXPECT_EQ(property_get("a.b", nullptr, "d"), 0);
    EXPECT_EQ(property_get(std::string(500, 'k').c_str(), value, "d"), 1);
}

}  // namespace
