#include "core/KivFilter.h"

#include "core/KivFilterFactory.h"
#include "vccore/vc_error.h"
#include "vccore/vc_log.h"

#define VC_SOURCE "core/KivFilter"

namespace {

// A record around the caller's buffer: never owns the pixels, byte size
// unknown, the caller's extra word kept in the last field.
VCImage* makeWrappingImage(const unsigned char* data, int width, int height, int format,
                           int extra) {
    VCImage* image = new VCImage();
    image->data = const_cast<unsigned char*>(data);
    image->width = width;
    image->height = height;
    image->format = static_cast<uint32_t>(format);
    image->wrapped = 1;
    image->size = 0;
    image->uvOffset = static_cast<uint32_t>(extra);
    return image;
}

bool sameShape(const VCImage* image, int width, int height, int format) {
    return image->width == width && image->height == height &&
           image->format == static_cast<uint32_t>(format);
}

VCOptionValue_t noValue() {
    VCOptionValue_t value{};
    value.type = VCOPTION_TYPE_NONE;
    return value;
}

}  // namespace

KivFilter::KivFilter()
    : mWorkImage(nullptr), mInputImage(nullptr), mOutputImage(nullptr), mValueFlag(false) {}

KivFilter::~KivFilter() {
    delete mWorkImage;
    delete mInputImage;
    delete mOutputImage;
}

KivFilter* KivFilter::create(int id, void* arg) {
    VF_LogMsg(VF_LOG_DEBUG, "Trying to instantiate effect %d", id);
    return KivFilterFactory::create(id, arg);
}

int KivFilter::setValue(int id, int value) {
    // Unsigned test: negative values fail along with everything above 1.
    if (id == VALUE_FLAG && supportsValueFlag() && static_cast<unsigned int>(value) <= 1u) {
        mValueFlag = (value & 1) != 0;
        return VC_OK;
    }
    return VC_REPORT(VC_ERROR_INVALID_PARAM);
}

int KivFilter::getValue(int id, int defaultValue) {
    switch (id) {
        case VALUE_INPUT_WIDTH:
            return mInputImage != nullptr ? mInputImage->width : defaultValue;
        case VALUE_INPUT_HEIGHT:
            return mInputImage != nullptr ? mInputImage->height : defaultValue;
        case VALUE_INPUT_FORMAT:
            return mInputImage != nullptr ? static_cast<int>(mInputImage->format) : defaultValue;
        case VALUE_FILTER_TYPE: {
            int type = getFilterType();
            return type != -1 ? type : defaultValue;
        }
        case VALUE_FLAG:
            return supportsValueFlag() ? (mValueFlag ? 1 : 0) : defaultValue;
        default:
            return defaultValue;
    }
}

int KivFilter::setInputImage(const unsigned char* data, int width, int height, int format,
                             int extra) {
    bool changed = true;
    if (mInputImage != nullptr) {
        changed = !sameShape(mInputImage, width, height, format);
        delete mInputImage;
        mInputImage = nullptr;
    }
    if (!checkSupportFormat(format)) return VC_REPORT(VC_ERROR_UNSUPPORTED);
    if (data == nullptr) return VC_OK;
    mInputImage = makeWrappingImage(data, width, height, format, extra);
    if (changed) onInputFormatChanged();
    onInputImageSet();
    return VC_OK;
}

int KivFilter::setOutputImage(unsigned char* data, int width, int height, int format, int extra) {
    delete mOutputImage;
    mOutputImage = nullptr;
    if (data == nullptr) return VC_OK;
    mOutputImage = makeWrappingImage(data, width, height, format, extra);
    // The output stays set: a caller may still fix the input afterwards.
    if (mInputImage != nullptr && !sameShape(mInputImage, width, height, format)) {
        return VC_REPORT(VC_ERROR_INVALID_SIZE);
    }
    return VC_OK;
}

int KivFilter::init() {
    if (mInputImage == nullptr) return VC_REPORT(VC_ERROR_UNKNOWN);
    if (!needsWorkImage()) {
        delete mWorkImage;
        mWorkImage = nullptr;
        return VC_OK;
    }
    if (mWorkImage != nullptr && VCImage_size(mWorkImage) == VCImage_size(mInputImage)) {
        // Same byte count: keep the buffer and relabel it. Its contents are
        // scratch, so effects are not told about the relabelling.
        mWorkImage->width = mInputImage->width;
        mWorkImage->height = mInputImage->height;
        mWorkImage->format = mInputImage->format;
        return VC_OK;
    }
    delete mWorkImage;
    mWorkImage = VCImage_createNew(mInputImage->width, mInputImage->height, mInputImage->format);
    if (mWorkImage == nullptr) return VC_REPORT(VC_ERROR_ALLOC_FAILED);
    onWorkImageChanged();
    return VC_OK;
}

int KivFilter::release() {
    delete mWorkImage;
    mWorkImage = nullptr;
    onWorkImageChanged();
    return VC_OK;
}

int KivFilter::loadPartialFragmentShader(EglProgram&, const char*, unsigned int&) {
    return VC_ERROR_UNSUPPORTED;
}

int KivFilter::loadExtFragmentShader(EglProgram&) {
    return VC_ERROR_UNSUPPORTED;
}

const char* KivFilter::getPkgAndFileName() {
    return nullptr;
}

int KivFilter::onDrawFrame(EglProgram&) {
    return VC_OK;
}

void KivFilter::onInputImageSet() {}

int KivFilter::releaseGL(EglRecycler&) {
    return VC_OK;
}

bool KivFilter::isGLPreviewSupported() {
    return true;
}

bool KivFilter::isGLPictureSupported() {
    return true;
}

int KivFilter::getOptionsCount() const {
    const VCOption_t* const* options = listOptions();
    int count = 0;
    if (options != nullptr) {
        while (options[count] != nullptr) ++count;
    }
    return count;
}

const char* const* KivFilter::listOptionNames() const {
    return nullptr;
}

const VCOption_t* const* KivFilter::listOptions() const {
    return nullptr;
}

const VCOption_t* KivFilter::getOptionDesc(int) const {
    return nullptr;
}

const VCOption_t* KivFilter::getOptionDesc(const char*) const {
    return nullptr;
}

// By-id access resolves the process-wide key to its name and goes through
// the by-name operation, so effects only implement names.
int KivFilter::setOption(int id, int value) {
    const char* name = VCOption_FindNameById(static_cast<uint32_t>(id));
    if (name == nullptr) {
        VF_LogMsg(VF_LOG_ERROR, "Option not found: %d", id);
        return 0;
    }
    return setOption(name, value);
}

int KivFilter::setOption(int id, float value) {
    const char* name = VCOption_FindNameById(static_cast<uint32_t>(id));
    if (name == nullptr) {
        VF_LogMsg(VF_LOG_ERROR, "Option not found: %d", id);
        return 0;
    }
    return setOption(name, value);
}

int KivFilter::setOption(int id, const char* value) {
    const char* name = VCOption_FindNameById(static_cast<uint32_t>(id));
    if (name == nullptr) {
        VF_LogMsg(VF_LOG_ERROR, "Option not found: %d", id);
        return 0;
    }
    return setOption(name, value);
}

int KivFilter::setOption(const char*, int) {
    return 0;
}

int KivFilter::setOption(const char*, float) {
    return 0;
}

int KivFilter::setOption(const char*, const char*) {
    return 0;
}

void KivFilter::kivImagingSetCallback(KivFilterCallback, void*) {}

VCOptionValue_t KivFilter::getOption(const char*) const {
    return noValue();
}

VCOptionValue_t KivFilter::getOption(int id) const {
    const char* name = VCOption_FindNameById(static_cast<uint32_t>(id));
    if (name == nullptr) {
        VF_LogMsg(VF_LOG_ERROR, "Option not found: %d", id);
        return noValue();
    }
    return getOption(name);
}

bool KivFilter::checkSupportFormat(int) const {
    return true;
}

bool KivFilter::needsWorkImage() const {
    return true;
}

void KivFilter::onWorkImageChanged() {}

void KivFilter::onInputFormatChanged() {}

bool KivFilter::supportsValueFlag() const {
    return true;
}
