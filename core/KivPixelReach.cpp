#include "core/KivPixelReach.h"

#include "core/KivFilter.h"

KivPixelReach KivFilter_pixelReach(const KivFilter* filter, int width, int height) {
    const auto* source = dynamic_cast<const KivPixelReachSource*>(filter);
    if (source == nullptr) return {KivPixelReach::WHOLE_PICTURE, 0};
    return source->pixelReach(width, height);
}
