#include "core/KivFilterFactory.h"

#include "core/KivFilter.h"

// Effect headers: one include per effect family.

namespace {

// One row per effect class: {first id, last id, builder}. Ids without a row
// yield null and processors fall back to 400.
const KivFilterFactory::Entry kEffects[] = {
    {0, -1, nullptr},  // placeholder: serves no id (firstId > lastId)
};

}  // namespace

KivFilter* KivFilterFactory::createFrom(const Entry* table, size_t count, int id, void* arg) {
    if (table == nullptr) return nullptr;
    for (size_t i = 0; i < count; ++i) {
        const Entry& row = table[i];
        if (row.create != nullptr && id >= row.firstId && id <= row.lastId) {
            return row.create(id, arg);
        }
    }
    return nullptr;
}

KivFilter* KivFilterFactory::create(int id, void* arg) {
    return createFrom(kEffects, sizeof(kEffects) / sizeof(kEffects[0]), id, arg);
}
