/* Compiled as C: proves the C API header is usable from C and drives the
 * API the way a C client does. Each check returns its line on failure. */
#include <stddef.h>
#include <string.h>

#include "core/KivImaging.h"
#include "vccore/vc_image.h"

#define CHECK(cond)                   \
    do {                              \
        if (!(cond)) return __LINE__; \
    } while (0)

int kivtest_c_null_handles(void) {
    unsigned char pixels[16];
    VCOptionValue_t v;
    KivFilter* none = NULL;

    CHECK(KivImaging_setValue(none, 111, 1) == -3);
    CHECK(KivImaging_getValue(none, 102, 77) == 77);
    CHECK(KivImaging_getValue(none, 105, -12) == -12);
    CHECK(KivImaging_setInputImage(none, pixels, 2, 2, (int)VC_FORMAT_RGBA, 0) == -3);
    CHECK(KivImaging_setOutputImage(none, pixels, 2, 2, (int)VC_FORMAT_RGBA, 0) == -3);
    CHECK(KivImaging_doEffect(none) == -3);
    CHECK(KivImaging_init(none) == -3);
    CHECK(KivImaging_release(none) == -3);
    CHECK(KivImaging_isGLPreviewSupported(none) == 0);
    CHECK(KivImaging_isGLPictureSupported(none) == 0);
    CHECK(KivImaging_supportsInputFormat(none, (int)VC_FORMAT_RGBA) == 0);
    CHECK(KivImaging_getOptionsCount(none) == -3);
    CHECK(KivImaging_listOptionNames(none) == NULL);
    CHECK(KivImaging_listOptions(none) == NULL);
    CHECK(KivImaging_getOptionDescById(none, 1) == NULL);
    CHECK(KivImaging_getOptionDescByName(none, "parameter") == NULL);
    CHECK(KivImaging_setOptionByIdI(none, 1, 1) == 0);
    CHECK(KivImaging_setOptionByIdF(none, 1, 1.0f) == 0);
    CHECK(KivImaging_setOptionByIdS(none, 1, "intensity=1") == 0);
    CHECK(KivImaging_setOptionByNameI(none, "parameter", 1) == 0);
    CHECK(KivImaging_setOptionByNameF(none, "parameter", 1.0f) == 0);
    CHECK(KivImaging_setOptionByNameS(none, "parameter", "intensity=1") == 0);

    memset(&v, 0x7f, sizeof(v));
    v = KivImaging_getOptionByName(none, "parameter");
    CHECK(v.type == 0 && v.value.i == 0 && v.reserved == 0);
    memset(&v, 0x7f, sizeof(v));
    v = KivImaging_getOptionById(none, 1);
    CHECK(v.type == 0 && v.value.i == 0 && v.reserved == 0);

    KivImaging_destroy(none);
    /* Ids no effect has. */
    CHECK(KivImaging_create(203, NULL) == NULL);
    CHECK(KivImaging_create(-1, NULL) == NULL);
    return 0;
}
