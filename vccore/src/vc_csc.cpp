#include "vc_csc.h"

#include <dlfcn.h>

#include "vccore/vc_error.h"

#define VC_SOURCE "vccore/src/vc_csc"

namespace {

typedef void (*CscArgbToYuv420sp)(unsigned char* yDst, unsigned char* uvDst, unsigned char* rgbSrc,
                                  unsigned int width, unsigned int height);

}  // namespace

extern "C" int csc_run(const VCImage* source, VCImage* destination) {
    if (source == nullptr || destination == nullptr) return VC_ERROR_UNSUPPORTED;
    if (source->format != VC_FORMAT_BGRA || destination->format != VC_FORMAT_NV12)
        return VC_ERROR_UNSUPPORTED;
    // Flagged on every use so that the missing hardware path shows in the log;
    // the conversion still goes on.
    VC_REPORT(VC_ERROR_NOT_IMPLEMENTED);

    void* library = dlopen("libcsc.so", RTLD_NOW | RTLD_LOCAL);
    if (library == nullptr) return VC_REPORT(VC_ERROR_UNSUPPORTED);
    CscArgbToYuv420sp convert =
        reinterpret_cast<CscArgbToYuv420sp>(dlsym(library, "csc_ARGB8888_to_YUV420SP_NEON"));
    if (convert == nullptr)
        convert = reinterpret_cast<CscArgbToYuv420sp>(dlsym(library, "csc_ARGB8888_to_YUV420SP"));
    if (convert == nullptr) {
        dlclose(library);
        return VC_REPORT(VC_ERROR_UNSUPPORTED);
    }
    const unsigned int luma =
        static_cast<unsigned int>(source->width) * static_cast<unsigned int>(source->height);
    unsigned char* chroma =
        destination->data + (destination->uvOffset != 0 ? destination->uvOffset : luma);
    convert(destination->data, chroma, source->data, static_cast<unsigned int>(source->width),
            static_cast<unsigned int>(source->height));
    dlclose(library);
    return VC_OK;
}
