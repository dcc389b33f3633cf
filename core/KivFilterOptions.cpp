#include "core/KivFilterOptions.h"

#include <string.h>

namespace {

VCOption_t makeRecord(const char* name, VCOptionType_t type) {
    VCOption_t option{};
    option.key = 0;
    option.name = name;
    option.type = type;
    option.min.type = type;
    option.max.type = type;
    option.enumValues = nullptr;
    return option;
}

}  // namespace

VCOption_t KivOption_string(const char* name) {
    return makeRecord(name, VCOPTION_TYPE_STRING);
}

VCOption_t KivOption_int(const char* name, int min, int max) {
    VCOption_t option = makeRecord(name, VCOPTION_TYPE_INTEGER);
    option.min.value.i = min;
    option.max.value.i = max;
    return option;
}

VCOption_t KivOption_float(const char* name, float min, float max) {
    VCOption_t option = makeRecord(name, VCOPTION_TYPE_FLOAT);
    option.min.value.f = min;
    option.max.value.f = max;
    return option;
}

VCOption_t KivOption_enum(const char* name, const VCOptionEnum_t* values) {
    VCOption_t option = makeRecord(name, VCOPTION_TYPE_ENUM);
    option.enumValues = values;
    return option;
}

KivFilterOptionTable::KivFilterOptionTable(VCOption_t* records, size_t count)
    : mRecords(records), mCount(records != nullptr ? count : 0) {
    mNames.reserve(mCount + 1);
    mPointers.reserve(mCount + 1);
    for (size_t i = 0; i < mCount; ++i) {
        mNames.push_back(mRecords[i].name);
        mPointers.push_back(&mRecords[i]);
    }
    mNames.push_back(nullptr);
    mPointers.push_back(nullptr);
}

void KivFilterOptionTable::registerOnce() {
    std::call_once(mRegisterOnce, [this] {
        for (size_t i = 0; i < mCount; ++i) VCOption_RegisterNew(&mRecords[i]);
        mRegistered = true;
    });
}

bool KivFilterOptionTable::isRegistered() const {
    return mRegistered;
}

const VCOption_t* KivFilterOptionTable::find(int id) const {
    for (size_t i = 0; i < mCount; ++i) {
        // Unregistered records have key 0, which no registered option uses.
        if (mRecords[i].key != 0 && mRecords[i].key == static_cast<uint32_t>(id)) {
            return &mRecords[i];
        }
    }
    return nullptr;
}

const VCOption_t* KivFilterOptionTable::find(const char* name) const {
    if (name == nullptr) return nullptr;
    for (size_t i = 0; i < mCount; ++i) {
        if (mRecords[i].name != nullptr && strcmp(mRecords[i].name, name) == 0) {
            return &mRecords[i];
        }
    }
    return nullptr;
}
