#include "core/filters/sce/fixedLooks.h"

const char* NoEffect::getFragmentShader() const {
    return kPassThroughShader;
}
