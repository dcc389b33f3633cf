// Stand-in for the optional converter library: counts conversions and hands
// back a value the caller can recognise. Built without vc_csc_convert when
// KIV_CSC_PARTIAL is defined, to exercise the missing-symbol path.
#include <stdint.h>
#include <stdlib.h>

struct StandinState {
    int width;
    int calls;
};

void* vc_csc_init(int width, int height, uint32_t sourceFormat, uint32_t destinationFormat) {
    (void)height;
    (void)sourceFormat;
    (void)destinationFormat;
    // A width of 13 plays a geometry the hardware refuses.
    if (width == 13) return NULL;
    struct StandinState* state = calloc(1, sizeof(struct StandinState));
    if (state != NULL) state->width = width;
    return state;
}

void vc_csc_release(void* state) {
    free(state);
}

#ifndef KIV_CSC_PARTIAL
int vc_csc_convert(void* state, const void* source, void* destination) {
    (void)source;
    (void)destination;
    struct StandinState* s = state;
    s->calls++;
    return s->width * 1000 + s->calls;
}
#endif
