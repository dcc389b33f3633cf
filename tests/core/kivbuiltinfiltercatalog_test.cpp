#include <gtest/gtest.h>

#include <utils/StrongPointer.h>

#include <string>
#include <utility>

#include "core/KivBuiltInFilterCatalog.h"

namespace {

const std::string kMaker = "com.morvane.android.provider.filterprovider";

TEST(KivBuiltInFilterCatalog, MakerRows) {
    android::sp<KivBuiltInFilterCatalog> catalog = new KivBuiltInFilterCatalog(0);
    const char* const libraries[] = {"libfilm.so",      "libvivid.so",  "libcalm.so",
                                     "libretro.so",     "libpastel.so", "libgrayscale.so",
                                     "libevergreen.so", "libdawn.so"};
    EXPECT_EQ(catalog->size(), 8u);
    for (int i = 0; i < 8; ++i) {
        EXPECT_EQ(catalog->getBuiltInFilterId((kMaker + "," + libraries[i]).c_str()), 501 + i);
        EXPECT_EQ(catalog->getBuiltInFilterId((kMaker + "." + libraries[i]).c_str()), -1);
    }
    // Exact, case-sensitive, whole-name matches only.
    for (const std::string& near :
         {kMaker + ",libFilm.so", kMaker + ",libfilm", kMaker + ",libfilm.so ",
          std::string("libfilm.so"), std::string()}) {
        EXPECT_EQ(catalog->getBuiltInFilterId(near.c_str()), -1) << near;
    }
    EXPECT_EQ(catalog->getBuiltInFilterId(nullptr), -1);
}

TEST(KivBuiltInFilterCatalog, VendorRowsComeInPairs) {
    android::sp<KivBuiltInFilterCatalog> catalog = new KivBuiltInFilterCatalog(1);
    const char* const libraries[] = {"libriddle.so",   "libdelicious.so", "libgold.so",
                                     "libsweet.so",    "libnostalgia.so", "librose.so",
                                     "libmonogram.so", "libeveryday.so"};
    const char* const vendors[] = {
        "com.example.filtervendor.alpha", "com.example.filtervendor.bravo",
        "com.example.filtervendor.charlie", "com.example.filtervendor.delta"};
    EXPECT_EQ(catalog->size(), 8u);
    for (int i = 0; i < 8; ++i) {
        const std::string vendor = vendors[i / 2];  // rows 1-2, 3-4, 5-6, 7-8 share a vendor
        EXPECT_EQ(catalog->getBuiltInFilterId((vendor + "." + libraries[i]).c_str()), i + 1);
        EXPECT_EQ(catalog->getBuiltInFilterId((vendor + "," + libraries[i]).c_str()), -1);
    }
    EXPECT_EQ(catalog->getBuiltInFilterId((kMaker + ",libfilm.so").c_str()), -1);
}

TEST(KivBuiltInFilterCatalog, AddReleaseAndOtherTypes) {
    for (int type : {2, -1}) {
        android::sp<KivBuiltInFilterCatalog> empty = new KivBuiltInFilterCatalog(type);
        EXPECT_EQ(empty->size(), 0u);
        EXPECT_EQ(empty->getBuiltInFilterId((kMaker + ",libfilm.so").c_str()), -1);
    }
    android::sp<KivBuiltInFilterCatalog> catalog = new KivBuiltInFilterCatalog(0);
    EXPECT_FALSE(catalog->addBuiltInFilter(nullptr, 5));
    EXPECT_FALSE(catalog->addBuiltInFilter((kMaker + ",libdawn.so").c_str(), 400));
    EXPECT_EQ(catalog->getBuiltInFilterId((kMaker + ",libdawn.so").c_str()), 508);
    // Inserted out of order, all found: the vector stays sorted.
    const std::pair<const char*, int> added[] = {
        {"zz.last", 3}, {"AA.first", 1}, {"m.middle", 2}, {"M.middle", 4}};
    for (const auto& [name, id] : added) EXPECT_TRUE(catalog->addBuiltInFilter(name, id));
    EXPECT_FALSE(catalog->addBuiltInFilter("m.middle", 9));
    EXPECT_EQ(catalog->size(), 12u);
    for (const auto& [name, id] : added) EXPECT_EQ(catalog->getBuiltInFilterId(name), id);
    EXPECT_EQ(catalog->getBuiltInFilterId((kMaker + ",libfilm.so").c_str()), 501);

    catalog->release();
    EXPECT_EQ(catalog->size(), 0u);
    EXPECT_EQ(catalog->getType(), BUILT_IN_FILTER_MORVANE);
    EXPECT_EQ(catalog->getBuiltInFilterId("zz.last"), -1);
    EXPECT_TRUE(catalog->addBuiltInFilter("zz.last", 6));
    EXPECT_EQ(catalog->getBuiltInFilterId("zz.last"), 6);
}

}  // namespace
