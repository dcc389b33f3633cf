// Fuzzes effect parameter texts: the registry's parsers, the text check that
// warns about what a text cannot set, and every effect that reads a
// "parameter" text (no GL needed: setting options only stores numbers).
#include <stddef.h>
#include <stdint.h>

#include <memory>
#include <string>

#include "core/KivFilter.h"
#include "core/KivImaging.h"
#include "core/KivParameterOption.h"
#include "vccore/vc_log.h"
#include "vccore/vc_options.h"

namespace {

void quietLog(int, const char*, ...) {}

// The effects with a "parameter" option that reads name=value pairs.
const int kEffects[] = {425, 431, 432, 433, 434, 435, 436, 446, 447};

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***) {
    VF_LogMsg = quietLog;
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    // Texts arrive as C strings: stop at the first NUL like any caller would.
    std::string text(reinterpret_cast<const char*>(data), size);
    text = text.c_str();
    static const char* const kKeys[] = {"intensity", "highlight", "shadow", "TE",
                                        "SA",        "face",      nullptr};
    KivParameterString_check("fuzz", text.c_str(), kKeys);
    for (const char* key : kKeys) {
        if (key == nullptr) break;
        volatile int i = VCOption_ParseStringI(text.c_str(), key, 7);
        volatile float f = VCOption_ParseStringF(text.c_str(), key, 7.0f);
        (void)i;
        (void)f;
    }
    static std::unique_ptr<KivFilter> effects[sizeof(kEffects) / sizeof(kEffects[0])];
    for (size_t e = 0; e < sizeof(kEffects) / sizeof(kEffects[0]); ++e) {
        if (!effects[e]) effects[e].reset(KivImaging_create(kEffects[e], nullptr));
        // Every text is taken (values it cannot read become neutral).
        if (KivImaging_setOptionByNameS(effects[e].get(), "parameter", text.c_str()) != 1)
            __builtin_trap();
    }
    return 0;
}
