#include "core/KivImaging.h"

#include "core/KivFilter.h"

// A null handle never reaches the effect: each entry answers with its neutral
// value instead, so C callers can pass a failed create's result straight on.

extern "C" KivFilter* KivImaging_create(int id, void* arg) {
    return KivFilter::create(id, arg);
}

extern "C" void KivImaging_destroy(KivFilter* filter) {
    delete filter;
}

extern "C" const char* KivImaging_getPkgAndFileName(KivFilter* filter) {
    return filter->getPkgAndFileName();
}

extern "C" int KivImaging_setValue(KivFilter* filter, int id, int value) {
    if (filter == nullptr) return VC_ERROR_INVALID_PARAM;
    return filter->setValue(id, value);
}

extern "C" int KivImaging_getValue(KivFilter* filter, int id, int defaultValue) {
    if (filter == nullptr) return defaultValue;
    return filter->getValue(id, defaultValue);
}

extern "C" int KivImaging_setInputImage(KivFilter* filter, const unsigned char* data, int width,
                                        int height, int format, int extra) {
    if (filter == nullptr) return VC_ERROR_INVALID_PARAM;
    return filter->setInputImage(data, width, height, format, extra);
}

extern "C" int KivImaging_setOutputImage(KivFilter* filter, unsigned char* data, int width,
                                         int height, int format, int extra) {
    if (filter == nullptr) return VC_ERROR_INVALID_PARAM;
    return filter->setOutputImage(data, width, height, format, extra);
}

extern "C" int KivImaging_doEffect(KivFilter* filter) {
    if (filter == nullptr) return VC_ERROR_INVALID_PARAM;
    return filter->doEffect();
}

extern "C" int KivImaging_init(KivFilter* filter) {
    if (filter == nullptr) return VC_ERROR_INVALID_PARAM;
    return filter->init();
}

extern "C" int KivImaging_release(KivFilter* filter) {
    if (filter == nullptr) return VC_ERROR_INVALID_PARAM;
    filter->release();
    return VC_OK;
}

extern "C" int KivImaging_isGLPreviewSupported(KivFilter* filter) {
    if (filter == nullptr) return 0;
    return filter->isGLPreviewSupported() ? 1 : 0;
}

extern "C" int KivImaging_isGLPictureSupported(KivFilter* filter) {
    if (filter == nullptr) return 0;
    return filter->isGLPictureSupported() ? 1 : 0;
}

extern "C" int KivImaging_supportsInputFormat(KivFilter* filter, int format) {
    if (filter == nullptr) return 0;
    return filter->checkSupportFormat(format) ? 1 : 0;
}

extern "C" int KivImaging_getOptionsCount(KivFilter* filter) {
    if (filter == nullptr) return VC_ERROR_INVALID_PARAM;
    return filter->getOptionsCount();
}

extern "C" const char* const* KivImaging_listOptionNames(KivFilter* filter) {
    if (filter == nullptr) return nullptr;
    return filter->listOptionNames();
}

extern "C" const VCOption_t* const* KivImaging_listOptions(KivFilter* filter) {
    if (filter == nullptr) return nullptr;
    return filter->listOptions();
}

extern "C" const VCOption_t* KivImaging_getOptionDescById(KivFilter* filter, int id) {
    if (filter == nullptr) return nullptr;
    return filter->getOptionDesc(id);
}

extern "C" const VCOption_t* KivImaging_getOptionDescByName(KivFilter* filter, const char* name) {
    if (filter == nullptr) return nullptr;
    return filter->getOptionDesc(name);
}

extern "C" int KivImaging_setOptionByIdI(KivFilter* filter, int id, int value) {
    if (filter == nullptr) return 0;
    return filter->setOption(id, value);
}

extern "C" int KivImaging_setOptionByIdF(KivFilter* filter, int id, float value) {
    if (filter == nullptr) return 0;
    return filter->setOption(id, value);
}

extern "C" int KivImaging_setOptionByIdS(KivFilter* filter, int id, const char* value) {
    if (filter == nullptr) return 0;
    return filter->setOption(id, value);
}

extern "C" int KivImaging_setOptionByNameI(KivFilter* filter, const char* name, int value) {
    if (filter == nullptr) return 0;
    return filter->setOption(name, value);
}

extern "C" int KivImaging_setOptionByNameF(KivFilter* filter, const char* name, float value) {
    if (filter == nullptr) return 0;
    return filter->setOption(name, value);
}

extern "C" int KivImaging_setOptionByNameS(KivFilter* filter, const char* name, const char* value) {
    if (filter == nullptr) return 0;
    return filter->setOption(name, value);
}

extern "C" VCOptionValue_t KivImaging_getOptionByName(KivFilter* filter, const char* name) {
    if (filter == nullptr) return VCOptionValue_t{};
    return filter->getOption(name);
}

extern "C" VCOptionValue_t KivImaging_getOptionById(KivFilter* filter, int id) {
    if (filter == nullptr) return VCOptionValue_t{};
    return filter->getOption(id);
}

void KivImaging::kivImagingSetCallback(KivFilterCallback callback, void* context) {
    if (mFilter == nullptr) return;
    mCallback = callback;
    mContext = context;
    mFilter->kivImagingSetCallback(&KivImaging::callbackTrampoline, this);
}

void KivImaging::callbackTrampoline(const char* message, void* self) {
    KivImaging* imaging = static_cast<KivImaging*>(self);
    if (imaging != nullptr && imaging->mCallback != nullptr) {
        imaging->mCallback(message, imaging->mContext);
    }
}
