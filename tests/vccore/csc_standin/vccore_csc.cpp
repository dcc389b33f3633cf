// Stand-in for the optional converter library: counts conversions and hands
// back a value the caller can recognise. Built without vc_csc_convert when
// KIV_CSC_PARTIAL is defined, to exercise the missing-symbol path.
#include <stdint.h>
#include <stdlib.h>

#include "vccore/vc_image.h"

namespace {

struct StandinState {
    int width;
    int height;
    int calls;
};

}  // namespace

extern "C" void* vc_csc_init(int width, int height, uint32_t sourceFormat,
                             uint32_t destinationFormat) {
    (void)sourceFormat;
    (void)destinationFormat;
    // A width of 13 plays a geometry the hardware refuses.
    if (width == 13) return NULL;
    StandinState* state = static_cast<StandinState*>(calloc(1, sizeof(StandinState)));
    if (state != NULL) {
        state->width = width;
        state->height = height;
    }
    return state;
}

extern "C" void vc_csc_release(void* state) {
    free(state);
}

#ifndef KIV_CSC_PARTIAL
extern "C" int vc_csc_convert(void* state, const VCImage* source, VCImage* destination) {
    StandinState* s = static_cast<StandinState*>(state);
    s->calls++;
    // A width of 24 plays a conversion that works: it succeeds and fills the
    // first width x height bytes with the first source byte ^ 0x5A.
    if (s->width == 24) {
        for (int i = 0; i < s->width * s->height; ++i)
            destination->data[i] = source->data[0] ^ 0x5A;
        return 0;
    }
    return s->width * 1000 + s->calls;
}
#endif
