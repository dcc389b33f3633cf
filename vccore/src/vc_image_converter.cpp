// Thin handle around the optional external conversion library used for
// repeated conversions of one geometry.
#include <dlfcn.h>
#include <stdlib.h>

#include <atomic>

#include "vc_image_layout.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_log.h"

namespace {

typedef void* (*CscInit)(int width, int height, uint32_t sourceFormat, uint32_t destinationFormat);
typedef void (*CscRelease)(void* state);
typedef int (*CscConvert)(void* state, const VCImage* source, VCImage* destination);

// Cleared for good once the library or one of its entries is found missing.
std::atomic<bool> gCscAvailable{true};

const char* fourcc(const uint32_t& format) {
    return reinterpret_cast<const char*>(&format);
}

}  // namespace

struct VCConverter {
    void* library;
    CscInit init;
    CscRelease release;
    CscConvert convert;
    void* state;
};

extern "C" VCConverter* VCConverter_create(int width, int height, uint32_t sourceFormat,
                                           uint32_t destinationFormat) {
    VF_LogMsg(VF_LOG_DEBUG, "%s: %dx%d %4.4s --> %4.4s", "VCConverter_create", width, height,
              fourcc(sourceFormat), fourcc(destinationFormat));
    if (!gCscAvailable.load()) return nullptr;
    // Opening an already loaded library only takes another reference; the
    // library stays loaded for the life of the process.
    void* library = dlopen("libvccore_csc.so", RTLD_NOW | RTLD_LOCAL);
    if (library == nullptr) {
        VF_LogMsg(VF_LOG_ERROR, "VCConverter: Could not open the dynamic library for CSC.");
        gCscAvailable.store(false);
        return nullptr;
    }
    CscInit init = reinterpret_cast<CscInit>(dlsym(library, "vc_csc_init"));
    CscRelease release = reinterpret_cast<CscRelease>(dlsym(library, "vc_csc_release"));
    CscConvert convert = reinterpret_cast<CscConvert>(dlsym(library, "vc_csc_convert"));
    if (init == nullptr || release == nullptr || convert == nullptr) {
        VF_LogMsg(VF_LOG_ERROR, "VCConverter: Could not find some symbols for CSC.");
        gCscAvailable.store(false);
        dlclose(library);
        return nullptr;
    }
    VF_LogMsg(VF_LOG_DEBUG, "VCConverter: Calling vc_csc_init: %dx%d %4.4s --> %4.4s", width,
              height, fourcc(sourceFormat), fourcc(destinationFormat));
    void* state = init(width, height, sourceFormat, destinationFormat);
    if (state == nullptr) {
        VF_LogMsg(VF_LOG_ERROR, "VCConverter: Could not create this converter.");
        return nullptr;
    }
    VCConverter* converter = static_cast<VCConverter*>(calloc(1, sizeof(VCConverter)));
    if (converter == nullptr) {
        release(state);
        return nullptr;
    }
    *converter = {library, init, release, convert, state};
    return converter;
}

extern "C" int VCConverter_convert(VCConverter* converter, const VCImage* source,
                                   VCImage* destination) {
    if (converter == nullptr || source == nullptr || destination == nullptr ||
        source->data == nullptr || destination->data == nullptr)
        return VC_REPORT(VC_ERROR_NULL_PARAM);
    return converter->convert(converter->state, source, destination);
}

extern "C" void VCConverter_release(VCConverter* converter) {
    if (converter == nullptr) return;
    converter->release(converter->state);
    free(converter);
}
