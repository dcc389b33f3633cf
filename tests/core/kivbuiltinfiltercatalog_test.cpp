// The built-in filter catalog: the maker's and the vendors' rows, exact
// whole-name matches, insertion and release.
#include <gtest/gtest.h>
#include <utils/StrongPointer.h>

#include <string>
#include <utility>

#include "core/KivBuiltInFilterCatalog.h"

namespace {

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

}  // namespace
