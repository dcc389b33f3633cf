// Selecting an effect by name, shared by every processor's setEffect(name).
#ifndef KIV_CORE_KIVEFFECTSELECTION_H
#define KIV_CORE_KIVEFFECTSELECTION_H

#include <functional>

class KivBuiltInFilterCatalog;
class KivFilter;

// Called with the current effect just before it is deleted: the processor
// detaches it from whatever draws it (e.g. its EglProgram's setFilter(null)).
typedef std::function<void(KivFilter* current)> KivEffectDetach;

// Builds an effect by id; empty means KivFilter::create (the factory).
typedef std::function<KivFilter*(int id, void* arg)> KivEffectCreate;

enum KivEffectSelectMode {
    // Keep the current effect when it already is the requested one.
    KIV_SELECT_REUSE_LOADED = 0,
    // Always build a fresh effect (the buffered processor's behaviour).
    KIV_SELECT_ALWAYS_NEW = 1,
};

// Returns the effect the processor should use from now on; the processor
// owns it. Returning `current` itself means "keep it": nothing was detached
// or deleted. Any other result means that `current` (when not null) has been
// passed to `detach` and deleted.
//
// 1. The catalog knows `name` (id != -1): an effect whose getFilterType()
//    equals that id is kept ("The effect is already loaded. filename = %s,
//    getFilterType() = %d"); otherwise the effect with that id is created.
// 2. Unknown name: an effect whose getPkgAndFileName() starts with `name` is
//    kept ("The effect is already loaded. filename = %s, getPkgAndName() =
//    %s"); otherwise a downloadable filter (id 2000) of that name is created.
// 3. When creation yields nothing, the pass-through effect 400 is created.
//
// status (optional) receives 0, or VC_ERROR_NULL_PARAM for a null name
// (current kept), or VC_ERROR_UNKNOWN when not even effect 400 could be built
// (null returned, current deleted).
KivFilter* KivSelectEffectByName(KivBuiltInFilterCatalog& catalog, KivFilter* current,
                                 const char* name, const KivEffectDetach& detach,
                                 int* status = nullptr,
                                 KivEffectSelectMode mode = KIV_SELECT_REUSE_LOADED,
                                 const KivEffectCreate& create = nullptr);

#endif
