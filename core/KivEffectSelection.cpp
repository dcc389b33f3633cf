#include "core/KivEffectSelection.h"

#include <string.h>

#include "core/KivBuiltInFilterCatalog.h"
#include "core/KivFilter.h"
#include "vccore/vc_error.h"
#include "vccore/vc_log.h"

#define VC_SOURCE "core/KivEffectSelection"

namespace {

const int kDownloadableFilterId = 2000;
const int kFallbackEffectId = 400;

void setStatus(int* status, int value) {
    if (status != nullptr) *status = value;
}

}  // namespace

KivFilter* KivSelectEffectByName(KivBuiltInFilterCatalog& catalog, KivFilter* current,
                                 const char* name, const KivEffectDetach& detach, int* status,
                                 KivEffectSelectMode mode, const KivEffectCreate& create) {
    if (name == nullptr) {
        setStatus(status, VC_REPORT(VC_ERROR_NULL_PARAM));
        return current;
    }
    const bool reuse = mode == KIV_SELECT_REUSE_LOADED && current != nullptr;
    const int id = catalog.getBuiltInFilterId(name);
    if (id != -1) {
        if (reuse && current->getFilterType() == id) {
            VF_LogMsg(VF_LOG_ERROR,
                      "The effect is already loaded. filename = %s, getFilterType() = %d", name,
                      current->getFilterType());
            setStatus(status, VC_OK);
            return current;
        }
    } else if (reuse) {
        // A downloadable filter reports "package,library" plus whatever it
        // appends; the requested name only has to be its prefix.
        const char* loaded = current->getPkgAndFileName();
        if (loaded != nullptr && strncmp(loaded, name, strlen(name)) == 0) {
            VF_LogMsg(VF_LOG_ERROR,
                      "The effect is already loaded. filename = %s, getPkgAndName() = %s", name,
                      loaded);
            setStatus(status, VC_OK);
            return current;
        }
    }

    if (current != nullptr) {
        if (detach) detach(current);
        delete current;
    }
    auto make = [&create](int effectId, void* arg) {
        return create ? create(effectId, arg) : KivFilter::create(effectId, arg);
    };
    KivFilter* effect =
        id != -1 ? make(id, nullptr) : make(kDownloadableFilterId, const_cast<char*>(name));
    if (effect == nullptr) effect = make(kFallbackEffectId, nullptr);
    setStatus(status, effect != nullptr ? VC_OK : VC_REPORT(VC_ERROR_UNKNOWN));
    return effect;
}
