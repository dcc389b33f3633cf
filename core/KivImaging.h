// C API over one effect object. The handle is the KivFilter itself; every
// function accepts a null handle and then returns the documented neutral value
// without calling anything (except KivImaging_getPkgAndFileName, which needs a
// valid handle). Valid C as well as C++; the effect stays an opaque type to
// clients in either language.
#ifndef KIV_CORE_KIVIMAGING_H
#define KIV_CORE_KIVIMAGING_H

#include "vccore/vc_options.h"

#ifdef __cplusplus
class KivFilter;
extern "C" {
#else
typedef struct KivFilter KivFilter;
#endif
typedef void (*KivFilterCallback)(const char* message, void* context);

// Null for an unknown id; arg is the downloadable filter's name for id 2000.
KivFilter* KivImaging_create(int id, void* arg);
void KivImaging_destroy(KivFilter* filter);
const char* KivImaging_getPkgAndFileName(KivFilter* filter);

int KivImaging_setValue(KivFilter* filter, int id, int value);
int KivImaging_getValue(KivFilter* filter, int id, int defaultValue);
int KivImaging_setInputImage(KivFilter* filter, const unsigned char* data, int width, int height,
                             int format, int extra);
int KivImaging_setOutputImage(KivFilter* filter, unsigned char* data, int width, int height,
                              int format, int extra);
int KivImaging_doEffect(KivFilter* filter);
int KivImaging_init(KivFilter* filter);
int KivImaging_release(KivFilter* filter);

int KivImaging_isGLPreviewSupported(KivFilter* filter);
int KivImaging_isGLPictureSupported(KivFilter* filter);
int KivImaging_supportsInputFormat(KivFilter* filter, int format);

int KivImaging_getOptionsCount(KivFilter* filter);
const char* const* KivImaging_listOptionNames(KivFilter* filter);
const VCOption_t* const* KivImaging_listOptions(KivFilter* filter);
const VCOption_t* KivImaging_getOptionDescById(KivFilter* filter, int id);
const VCOption_t* KivImaging_getOptionDescByName(KivFilter* filter, const char* name);

// Results are the effect's: 1 handled, 0 not handled (also for a null handle).
int KivImaging_setOptionByIdI(KivFilter* filter, int id, int value);
int KivImaging_setOptionByIdF(KivFilter* filter, int id, float value);
int KivImaging_setOptionByIdS(KivFilter* filter, int id, const char* value);
int KivImaging_setOptionByNameI(KivFilter* filter, const char* name, int value);
int KivImaging_setOptionByNameF(KivFilter* filter, const char* name, float value);
int KivImaging_setOptionByNameS(KivFilter* filter, const char* name, const char* value);

// An all-zero record for a null handle; type VCOPTION_TYPE_NONE when the effect
// has no such option.
VCOptionValue_t KivImaging_getOptionByName(KivFilter* filter, const char* name);
VCOptionValue_t KivImaging_getOptionById(KivFilter* filter, int id);

#ifdef __cplusplus
}  // extern "C"

// Refers to an effect (owns nothing) and relays the effect's event callback to
// a client callback with the client's own context.
class KivImaging {
public:
    explicit KivImaging(KivFilter* filter = nullptr) : mFilter(filter) {}

    KivFilter* getFilter() const { return mFilter; }
    void setFilter(KivFilter* filter) { mFilter = filter; }

    // Without a filter nothing is stored.
    void kivImagingSetCallback(KivFilterCallback callback, void* context);

private:
    static void callbackTrampoline(const char* message, void* self);

    KivFilter* mFilter;
    KivFilterCallback mCallback = nullptr;
    void* mContext = nullptr;
};
#endif

#endif
