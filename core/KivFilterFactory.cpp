#include "core/KivFilterFactory.h"

#include "core/KivFilter.h"
#include "core/KivFilterExternal.h"

// Effect headers: one include per effect family.
#include "core/filters/sce/beauty.h"
#include "core/filters/sce/colorEffects.h"
#include "core/filters/sce/fixedLooks.h"
#include "core/filters/sce/geometricEffects.h"

namespace {

// One row per effect class: {first id, last id, builder}. Ids without a row
// yield null and processors fall back to 400.
const KivFilterFactory::Entry kEffects[] = {
    // Fixed single-pass looks.
    {400, 400, KivFilterFactory::make<NoEffect>},
    {401, 401, KivFilterFactory::make<Sepia>},
    {402, 402, KivFilterFactory::make<Grayscale>},
    {403, 403, KivFilterFactory::make<Negative>},
    {408, 408, KivFilterFactory::make<FadedColor>},
    {410, 410, KivFilterFactory::make<Comic>},
    {412, 412, KivFilterFactory::make<GothicNoir>},
    {415, 415, KivFilterFactory::make<Rainbow>},
    {416, 416, KivFilterFactory::make<InstagramNashville>},
    {422, 422, KivFilterFactory::make<Vignette>},
    {440, 440, KivFilterFactory::make<BW>},
    {442, 442, KivFilterFactory::make<Posterize>},
    {443, 443, KivFilterFactory::make<ThermalVision>},
    // Adjustable colour effects and their presets.
    {425, 425, KivFilterFactory::make<CustomColor>},
    {426, 426, KivFilterFactory::make<Breezy>},
    {427, 427, KivFilterFactory::make<Vivid>},
    {428, 428, KivFilterFactory::make<Nostalgic>},
    {429, 429, KivFilterFactory::make<Soft>},
    {430, 430, KivFilterFactory::make<Serene>},
    {431, 431, KivFilterFactory::make<Brightness>},
    {432, 432, KivFilterFactory::make<Temperature>},
    {433, 433, KivFilterFactory::make<Contrast>},
    {434, 434, KivFilterFactory::make<Saturate>},
    {435, 435, KivFilterFactory::make<TintControl>},
    {436, 436, KivFilterFactory::make<HighlightShadow>},
    // Geometric effects.
    {417, 417, KivFilterFactory::make<FisheyeSingle>},
    {441, 441, KivFilterFactory::make<Embossed>},
    {444, 444, KivFilterFactory::make<Ripple>},
    {445, 445, KivFilterFactory::make<Mosaic>},
    {447, 447, KivFilterFactory::make<DistortionCorrection>},
    // Face smoothing.
    {446, 446, KivFilterFactory::make<Beauty>},
    // A filter library named by arg ("package,library").
    {2000, 2000, KivFilterFactory::makeWithArg<KivFilterExternal>},
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
