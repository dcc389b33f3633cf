// Names of filter libraries that the library implements natively, mapped to
// the ids of the built-in effects that replace them.
#ifndef KIV_CORE_KIVBUILTINFILTERCATALOG_H
#define KIV_CORE_KIVBUILTINFILTERCATALOG_H

#include <utils/Mutex.h>
#include <utils/RefBase.h>
#include <utils/SortedVector.h>
#include <utils/String8.h>
#include <utils/TypeHelpers.h>

// Which rows a catalog starts with. Any other value gives an empty catalog
// (hence the fixed underlying type: every int is a valid value).
enum BuiltInFitlerType : int {
    // "package,library" names of the maker's own filter libraries (ids 501…508)
    BUILT_IN_FILTER_MORVANE = 0,
    // "package.library" names of outside vendors' libraries (ids 1…8)
    BUILT_IN_FILTER_3RDPARTY = 1,
};

class KivBuiltInFilterCatalog : public virtual android::RefBase {
public:
    // A name and its effect id; ordered by name (byte-wise), names unique.
    typedef android::key_value_pair_t<android::String8, int> Entry;

    explicit KivBuiltInFilterCatalog(BuiltInFitlerType type);
    // For callers holding the type as a plain number.
    explicit KivBuiltInFilterCatalog(int type);

    // False for a null name or one already present (the first id stays).
    bool addBuiltInFilter(const char* name, int id);
    // The id, or -1 for a null or unknown name. Exact, case-sensitive match.
    int getBuiltInFilterId(const char* name) const;
    // Removes every row; the type stays.
    void release();

    BuiltInFitlerType getType() const { return mType; }
    size_t size() const;

protected:
    ~KivBuiltInFilterCatalog() override;

private:
    void initialize_morvane();
    void initialize_3rdparty();

    BuiltInFitlerType mType;
    // Lookups may come from client threads while another adds a row.
    mutable android::Mutex mLock;
    android::SortedVector<Entry> mFilters;
};

#endif
