// Effects whose one option is the STRING "parameter": a text of name=value
// pairs ("intensity=50", "TE=20,SA=-40").
//
// The values are read with VCOption_ParseStringI, whose rules stand: only the
// first occurrence of "name=" counts, and only when it starts the text or
// follows a ','; a name that is missing or unreadable gives the effect's
// neutral value. Those rules silently drop typing mistakes, so every text is
// also checked here and whatever had no effect, or was read differently from
// how it was written, is logged as a warning.
#ifndef KIV_CORE_KIVPARAMETEROPTION_H
#define KIV_CORE_KIVPARAMETEROPTION_H

#include "core/KivFilterOptions.h"

// Logs, for `effect`, each part of `text` that is not a pair, names no key of
// `keys` (null-terminated), is repeated, or cannot be read as VCOption_ParseStringI
// reads it. A null or empty text is fine (every key takes its neutral value).
// Returns the number of lines logged.
int KivParameterString_check(const char* effect, const char* text, const char* const* keys);

// What such an effect answers when asked which keys its text reads.
class KivParameterKeys {
public:
    // Null-terminated.
    virtual const char* const* parameterKeys() const = 0;

protected:
    ~KivParameterKeys() = default;
};

// The keys an effect's "parameter" text reads; null when the effect does not
// say (it has no such option, or reads it its own way).
const char* const* KivFilter_parameterKeys(const KivFilter* filter);

// Mixin for such an effect. Derived supplies
//   static const char kEffectName[];            its class name, for the log
//   static const char* const kParameterKeys[];  the keys it reads, null-terminated
//   void applyParameter(const char* text);      reads the keys and stores the result
template <class Derived, class Base>
class KivParameterOption : public KivFilterWithOptions<Derived, Base>, public KivParameterKeys {
public:
    template <class... Args>
    explicit KivParameterOption(Args&&... args) : KivFilterWithOptions<Derived, Base>(args...) {}

    static KivFilterOptionTable& optionTable() {
        static VCOption_t records[] = {KivOption_string("parameter")};
        static KivFilterOptionTable table(records);
        return table;
    }

    const char* const* parameterKeys() const override { return Derived::kParameterKeys; }

    using KivFilter::setOption;
    // 1 when the name is "parameter" (the text is applied), 0 for any other.
    int setOption(const char* name, const char* value) override {
        if (this->matchOption(name) == nullptr) return 0;
        KivParameterString_check(Derived::kEffectName, value, Derived::kParameterKeys);
        static_cast<Derived*>(this)->applyParameter(value);
        return 1;
    }
};

#endif
