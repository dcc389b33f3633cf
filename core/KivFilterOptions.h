// The one way an effect class declares its options.
//
// An effect with options keeps, class-wide, its VCOption_t records, a
// null-terminated array of their names and a null-terminated array of pointers
// to them, and registers the records with the process-wide registry once (its
// VCOPTION_REGISTER step), which assigns their numeric keys. A key is stable
// within one process only; two effects declaring the same name and type share
// one key.
//
// Usage (a single STRING option named "parameter"):
//
//   // Grain.h
//   class Grain : public KivFilterWithOptions<Grain, SingleCameraEffects> {
//   public:
//       static KivFilterOptionTable& optionTable();
//       using KivFilter::setOption;  // keep the other overloads visible
//       int setOption(const char* name, const char* value) override {
//           if (matchOption(name) == nullptr) return 0;  // not ours
//           mIntensity = VCOption_ParseStringF(value, "intensity", 1.0f);
//           return 1;
//       }
//   };
//
//   // Grain.cpp
//   KivFilterOptionTable& Grain::optionTable() {
//       static VCOption_t records[] = {KivOption_string("parameter")};
//       static KivFilterOptionTable table(records);
//       return table;
//   }
//
// The mixin registers the table from its constructor and answers
// listOptionNames(), listOptions() and both getOptionDesc() from it.
#ifndef KIV_CORE_KIVFILTEROPTIONS_H
#define KIV_CORE_KIVFILTEROPTIONS_H

#include <stddef.h>

#include <atomic>
#include <mutex>
#include <utility>
#include <vector>

#include "core/KivFilter.h"
#include "vccore/vc_options.h"

// Record builders. Bounds of 0…0 mean unbounded; STRING records carry the
// STRING type word in their bounds too.
VCOption_t KivOption_string(const char* name);
VCOption_t KivOption_int(const char* name, int min, int max);
VCOption_t KivOption_float(const char* name, float min, float max);
VCOption_t KivOption_enum(const char* name, const VCOptionEnum_t* values);

// The class-wide option set of one effect class. The records must outlive the
// process's use of the registry, so they are statics of the effect class.
class KivFilterOptionTable {
public:
    template <size_t N>
    explicit KivFilterOptionTable(VCOption_t (&records)[N]) : KivFilterOptionTable(records, N) {}
    KivFilterOptionTable(VCOption_t* records, size_t count);

    // Registers every record with VCOption_RegisterNew, once per process and
    // safely from any thread; later calls do nothing.
    void registerOnce();
    bool isRegistered() const;

    const char* const* names() const { return mNames.data(); }
    const VCOption_t* const* options() const { return mPointers.data(); }
    size_t count() const { return mCount; }

    // The record whose (registered) key equals id, or null.
    const VCOption_t* find(int id) const;
    // The record whose name equals name (strcmp), or null; null name gives null.
    const VCOption_t* find(const char* name) const;

    KivFilterOptionTable(const KivFilterOptionTable&) = delete;
    KivFilterOptionTable& operator=(const KivFilterOptionTable&) = delete;

private:
    VCOption_t* mRecords;
    size_t mCount;
    std::vector<const char*> mNames;           // null-terminated
    std::vector<const VCOption_t*> mPointers;  // null-terminated
    std::once_flag mRegisterOnce;
    std::atomic<bool> mRegistered{false};
};

// Mixin giving an effect class its option answers. Derived supplies
// `static KivFilterOptionTable& optionTable();` Base is KivFilter or one of its
// family bases; constructor arguments pass through to Base.
template <class Derived, class Base = KivFilter>
class KivFilterWithOptions : public Base {
public:
    template <class... Args>
    explicit KivFilterWithOptions(Args&&... args) : Base(std::forward<Args>(args)...) {
        VCOPTION_REGISTER();
    }

    // Class-wide registration; guarded, so every construction may call it.
    static void VCOPTION_REGISTER() { Derived::optionTable().registerOnce(); }

    const char* const* listOptionNames() const override { return Derived::optionTable().names(); }
    const VCOption_t* const* listOptions() const override {
        return Derived::optionTable().options();
    }
    const VCOption_t* getOptionDesc(int id) const override {
        return Derived::optionTable().find(id);
    }
    const VCOption_t* getOptionDesc(const char* name) const override {
        return Derived::optionTable().find(name);
    }

protected:
    // What a by-name setter tests first: the record of this effect named
    // `name`, or null when the name is not one of its options.
    static const VCOption_t* matchOption(const char* name) {
        return Derived::optionTable().find(name);
    }
};

#endif
