#include <gtest/gtest.h>

#include <utils/StrongPointer.h>

#include <string>

#include "core/KivBuiltInFilterCatalog.h"

namespace {

const char* const kMorvaneLibraries[] = {"libfilm.so",      "libvivid.so",  "libcalm.so",
                                         "libretro.so",     "libpastel.so", "libgrayscale.so",
                                         "libevergreen.so", "libdawn.so"};

TEST(KivBuiltInFilterCatalog, MakerRows) {
    android::sp<KivBuiltInFilterCatalog> catalog = new KivBuiltInFilterCatalog(0);
    EXPECT_EQ(catalog->getType(), BUILT_IN_FILTER_MORVANE);
    EXPECT_EQ(catalog->size(), 8u);
    for (int i = 0; i < 8; ++i) {
        std::string name =
            std::string("com.morvane.android.provider.filterprovider,") + kMorvaneLibraries[i];
        EXPECT_EQ(catalog->getBuiltInFilterId(name.c_str()), 501 + i) << name;
        // The dot-joined form is not a maker row.
        std::string dotted =
            std::string("com.morvane.android.provider.filterprovider.") + kMorvaneLibraries[i];
        EXPECT_EQ(catalog->getBuiltInFilterId(dotted.c_str()), -1) << dotted;
    }
    // Exact, case-sensitive, whole-name matches only.
    EXPECT_EQ(catalog->getBuiltInFilterId("com.morvane.android.provider.filterprovider,libFilm.so"),
              -1);
    EXPECT_EQ(catalog->getBuiltInFilterId("com.morvane.android.provider.filterprovider,libfilm"),
              -1);
    EXPECT_EQ(
        catalog->getBuiltInFilterId("com.morvane.android.provider.filterprovider,libfilm.so "), -1);
    EXPECT_EQ(catalog->getBuiltInFilterId("libfilm.so"), -1);
    EXPECT_EQ(catalog->getBuiltInFilterId(""), -1);
    EXPECT_EQ(catalog->getBuiltInFilterId(nullptr), -1);
}

TEST(KivBuiltInFilterCatalog, VendorRows) {
    android::sp<KivBuiltInFilterCatalog> catalog =
        new KivBuiltInFilterCatalog(BUILT_IN_FILTER_3RDPARTY);
    EXPECT_EQ(catalog->size(), 8u);
    const char* const libraries[] = {"libriddle.so",   "libdelicious.so", "libgold.so",
                                     "libsweet.so",    "libnostalgia.so", "librose.so",
                                     "libmonogram.so", "libeveryday.so"};
    // Rows come in vendor pairs: the package of row 2k equals that of 2k+1
    // and differs from every other pair's.
    std::string packages[4];
    for (int vendor = 0; vendor < 4; ++vendor) {
        for (const std::string& candidate : {std::string("com.example.filtervendor.alpha"),
                                             std::string("com.example.filtervendor.bravo"),
                                             std::string("com.example.filtervendor.charlie"),
                                             std::string("com.example.filtervendor.delta")}) {
            if (catalog->getBuiltInFilterId((candidate + "." + libraries[2 * vendor]).c_str()) ==
                2 * vendor + 1) {
                packages[vendor] = candidate;
            }
        }
        ASSERT_FALSE(packages[vendor].empty()) << libraries[2 * vendor];
        EXPECT_EQ(catalog->getBuiltInFilterId(
                      (packages[vendor] + "." + libraries[2 * vendor + 1]).c_str()),
                  2 * vendor + 2);
        // The comma form belongs to the maker catalog only.
        EXPECT_EQ(
            catalog->getBuiltInFilterId((packages[vendor] + "," + libraries[2 * vendor]).c_str()),
            -1);
        for (int other = 0; other < vendor; ++other) EXPECT_NE(packages[other], packages[vendor]);
    }
    EXPECT_EQ(catalog->getBuiltInFilterId("com.morvane.android.provider.filterprovider,libfilm.so"),
              -1);
}

TEST(KivBuiltInFilterCatalog, OtherTypesStartEmpty) {
    for (int type : {2, -1, 100}) {
        android::sp<KivBuiltInFilterCatalog> catalog = new KivBuiltInFilterCatalog(type);
        EXPECT_EQ(catalog->size(), 0u) << type;
        EXPECT_EQ(catalog->getType(), static_cast<BuiltInFitlerType>(type));
        EXPECT_EQ(
            catalog->getBuiltInFilterId("com.morvane.android.provider.filterprovider,libfilm.so"),
            -1);
        EXPECT_EQ(catalog->getBuiltInFilterId("com.example.filtervendor.alpha.libriddle.so"), -1);
    }
}

TEST(KivBuiltInFilterCatalog, AddAndRelease) {
    android::sp<KivBuiltInFilterCatalog> catalog = new KivBuiltInFilterCatalog(0);
    EXPECT_FALSE(catalog->addBuiltInFilter(nullptr, 5));
    // An existing name keeps its first id.
    EXPECT_FALSE(
        catalog->addBuiltInFilter("com.morvane.android.provider.filterprovider,libdawn.so", 400));
    EXPECT_EQ(catalog->getBuiltInFilterId("com.morvane.android.provider.filterprovider,libdawn.so"),
              508);
    // New names, in any order, are all found (the vector stays sorted).
    EXPECT_TRUE(catalog->addBuiltInFilter("zz.last", 3));
    EXPECT_TRUE(catalog->addBuiltInFilter("AA.first", 1));
    EXPECT_TRUE(catalog->addBuiltInFilter("m.middle", 2));
    EXPECT_TRUE(catalog->addBuiltInFilter("M.middle", 4));  // differs only by case
    EXPECT_FALSE(catalog->addBuiltInFilter("m.middle", 9));
    EXPECT_EQ(catalog->size(), 12u);
    EXPECT_EQ(catalog->getBuiltInFilterId("zz.last"), 3);
    EXPECT_EQ(catalog->getBuiltInFilterId("AA.first"), 1);
    EXPECT_EQ(catalog->getBuiltInFilterId("m.middle"), 2);
    EXPECT_EQ(catalog->getBuiltInFilterId("M.middle"), 4);
    EXPECT_EQ(catalog->getBuiltInFilterId("com.morvane.android.provider.filterprovider,libfilm.so"),
              501);

    catalog->release();
    EXPECT_EQ(catalog->size(), 0u);
    EXPECT_EQ(catalog->getType(), BUILT_IN_FILTER_MORVANE);
    EXPECT_EQ(catalog->getBuiltInFilterId("zz.last"), -1);
    EXPECT_EQ(catalog->getBuiltInFilterId("com.morvane.android.provider.filterprovider,libfilm.so"),
              -1);
    // Usable again after release.
    EXPECT_TRUE(catalog->addBuiltInFilter("zz.last", 6));
    EXPECT_EQ(catalog->getBuiltInFilterId("zz.last"), 6);
}

}  // namespace
