#include "core/KivBuiltInFilterCatalog.h"

namespace {

struct CatalogRow {
    const char* name;
    int id;
};

// The maker's own filter libraries, served by the table-and-curve looks.
const CatalogRow kMorvaneRows[] = {
    {"com.morvane.android.provider.filterprovider,libfilm.so", 501},
    {"com.morvane.android.provider.filterprovider,libvivid.so", 502},
    {"com.morvane.android.provider.filterprovider,libcalm.so", 503},
    {"com.morvane.android.provider.filterprovider,libretro.so", 504},
    {"com.morvane.android.provider.filterprovider,libpastel.so", 505},
    {"com.morvane.android.provider.filterprovider,libgrayscale.so", 506},
    {"com.morvane.android.provider.filterprovider,libevergreen.so", 507},
    {"com.morvane.android.provider.filterprovider,libdawn.so", 508},
};

// Known outside vendors' libraries, two per vendor, in "package.library" form.
// The downloadable filter uses this only to decide where the library lives.
const CatalogRow kThirdPartyRows[] = {
    {"com.example.filtervendor.alpha.libriddle.so", 1},
    {"com.example.filtervendor.alpha.libdelicious.so", 2},
    {"com.example.filtervendor.bravo.libgold.so", 3},
    {"com.example.filtervendor.bravo.libsweet.so", 4},
    {"com.example.filtervendor.charlie.libnostalgia.so", 5},
    {"com.example.filtervendor.charlie.librose.so", 6},
    {"com.example.filtervendor.delta.libmonogram.so", 7},
    {"com.example.filtervendor.delta.libeveryday.so", 8},
};

}  // namespace

KivBuiltInFilterCatalog::KivBuiltInFilterCatalog(BuiltInFitlerType type) : mType(type) {
    if (mType == BUILT_IN_FILTER_MORVANE) {
        initialize_morvane();
    } else if (mType == BUILT_IN_FILTER_3RDPARTY) {
        initialize_3rdparty();
    }
}

KivBuiltInFilterCatalog::KivBuiltInFilterCatalog(int type)
    : KivBuiltInFilterCatalog(static_cast<BuiltInFitlerType>(type)) {}

KivBuiltInFilterCatalog::~KivBuiltInFilterCatalog() {}

void KivBuiltInFilterCatalog::initialize_morvane() {
    for (const CatalogRow& row : kMorvaneRows) addBuiltInFilter(row.name, row.id);
}

void KivBuiltInFilterCatalog::initialize_3rdparty() {
    for (const CatalogRow& row : kThirdPartyRows) addBuiltInFilter(row.name, row.id);
}

bool KivBuiltInFilterCatalog::addBuiltInFilter(const char* name, int id) {
    if (name == nullptr) return false;
    android::Mutex::Autolock lock(mLock);
    Entry entry(android::String8(name), id);
    if (mFilters.indexOf(entry) >= 0) return false;
    mFilters.add(entry);
    return true;
}

int KivBuiltInFilterCatalog::getBuiltInFilterId(const char* name) const {
    if (name == nullptr) return -1;
    android::Mutex::Autolock lock(mLock);
    ssize_t index = mFilters.indexOf(Entry(android::String8(name)));
    if (index < 0) return -1;
    return mFilters.itemAt(static_cast<size_t>(index)).value;
}

void KivBuiltInFilterCatalog::release() {
    android::Mutex::Autolock lock(mLock);
    mFilters.clear();
}

size_t KivBuiltInFilterCatalog::size() const {
    android::Mutex::Autolock lock(mLock);
    return mFilters.size();
}
