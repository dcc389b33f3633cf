#include "core/egl/Platform.h"

#include <stdlib.h>
#include <string.h>
#include <strings.h>

#include <GLES2/gl2.h>
#include <cutils/properties.h>
#include <ui/GraphicBuffer.h>

#include "core/egl/EglCheck.h"
#include "core/egl/HalPixelFormat.h"
#include "vccore/vc_log.h"

#define VC_SOURCE "core/egl/Platform"

namespace {

struct BoardName {
    const char* name;
    int platform;
};

const BoardName kBoards[] = {
    {"tavrix3", Platform::PLATFORM_TAVRIX3}, {"tavrix4", Platform::PLATFORM_TAVRIX4},
    {"tavrix5", Platform::PLATFORM_TAVRIX5}, {"msm8952", Platform::PLATFORM_MSM8952},
    {"msm8960", Platform::PLATFORM_MSM8960}, {"msm8974", Platform::PLATFORM_MSM8974},
    {"msm8976", Platform::PLATFORM_MSM8976}, {"msm8992", Platform::PLATFORM_MSM8992},
    {"msm8994", Platform::PLATFORM_MSM8994}, {"apq8084", Platform::PLATFORM_APQ8084},
};

// msm8952 and msm8976 are missing on purpose: known boards, unknown vendor.
const BoardName kVendors[] = {
    {"tavrix3", Platform::VENDOR_KVAR}, {"tavrix4", Platform::VENDOR_KVAR},
    {"tavrix5", Platform::VENDOR_KVAR}, {"msm8960", Platform::VENDOR_QCOM},
    {"msm8974", Platform::VENDOR_QCOM}, {"msm8992", Platform::VENDOR_QCOM},
    {"msm8994", Platform::VENDOR_QCOM}, {"apq8084", Platform::VENDOR_QCOM},
};

// Cached answers; a race on first use only computes the same answer twice.
bool sPlatformComputed = false;
int sPlatform = Platform::PLATFORM_UNKNOWN;
bool sVendorComputed = false;
int sVendor = Platform::VENDOR_UNKNOWN;
bool sTavrixFullRangeComputed = false;
bool sTavrixFullRange = false;
bool sQcomFullRangeComputed = false;
bool sQcomFullRange = false;
bool sMaxTextureComputed = false;
int sMaxTexture = Platform::kDefaultMaximumTextureSize;

void readProperty(const char* key, char* value) {
    property_get(key, value, "");
}

int lookup(const BoardName* table, size_t count, const char* name, int fallback) {
    for (size_t i = 0; i < count; ++i) {
        if (strcasecmp(table[i].name, name) == 0) return table[i].platform;
    }
    return fallback;
}

bool chipIs(const char* chip, const char* name) {
    return strcasecmp(chip, name) == 0;
}

bool badAddress(const void* address) {
    return address == nullptr || address == reinterpret_cast<const void*>(~(uintptr_t)0);
}

}  // namespace

int Platform::getCurrentPlatform() {
    if (!sPlatformComputed) {
        char board[PROPERTY_VALUE_MAX];
        readProperty("ro.board.platform", board);
        sPlatform = lookup(kBoards, sizeof(kBoards) / sizeof(kBoards[0]), board, PLATFORM_UNKNOWN);
        EglLog(VF_LOG_DEBUG, "Current platform is %s (%s)", board,
               sPlatform != PLATFORM_UNKNOWN ? "known" : "unknown");
        sPlatformComputed = true;
    }
    return sPlatform;
}

int Platform::getCurrentVendor() {
    if (!sVendorComputed) {
        char board[PROPERTY_VALUE_MAX];
        readProperty("ro.board.platform", board);
        sVendor = lookup(kVendors, sizeof(kVendors) / sizeof(kVendors[0]), board, VENDOR_UNKNOWN);
        EglLog(VF_LOG_DEBUG, "%s",
               sVendor == VENDOR_KVAR   ? "Current vendor is KVAR"
               : sVendor == VENDOR_QCOM ? "Current vendor is QCOM"
                                        : "Current vendor is UNKNOWN");
        sVendorComputed = true;
    }
    return sVendor;
}

bool Platform::isSupported_TAVRIX_NV21_FULL_RANGE() {
    if (!sTavrixFullRangeComputed) {
        bool supported = false;
        if (getCurrentVendor() == VENDOR_KVAR) {
            char chip[PROPERTY_VALUE_MAX];
            readProperty("ro.chipname", chip);
            supported = !chipIs(chip, "tavrix5410") && !chipIs(chip, "tavrix3");
        }
        EglLog(VF_LOG_DEBUG, "isSupported_TAVRIX_NV21_FULL_RANGE %s", supported ? "true" : "false");
        sTavrixFullRange = supported;
        sTavrixFullRangeComputed = true;
    }
    return sTavrixFullRange;
}

bool Platform::isSupported_QCOM_NV21_FULL_RANGE() {
    if (!sQcomFullRangeComputed) {
        bool supported = false;
        if (getCurrentVendor() == VENDOR_QCOM) {
            char chip[PROPERTY_VALUE_MAX];
            readProperty("ro.chipname", chip);
            supported = !chipIs(chip, "apq8064");
        }
        EglLog(VF_LOG_DEBUG, "isSupported_QCOM_NV21_FULL_RANGE %s", supported ? "true" : "false");
        sQcomFullRange = supported;
        sQcomFullRangeComputed = true;
    }
    return sQcomFullRange;
}

bool Platform::isNativeInputFormat(uint32_t format) {
    switch (getCurrentPlatform()) {
        case PLATFORM_TAVRIX3:
        case PLATFORM_TAVRIX4:
            return format == VC_FORMAT_RGBA || format == VC_FORMAT_NV12 || format == VC_FORMAT_BGRA;
        case PLATFORM_TAVRIX5:
            return format == VC_FORMAT_NV21 || format == VC_FORMAT_NV12 ||
                   format == VC_FORMAT_RGBA || format == VC_FORMAT_BGRA;
        case PLATFORM_UNKNOWN:
            return format == VC_FORMAT_RGBA;
        default:
            return format == VC_FORMAT_NV21 || format == VC_FORMAT_RGBA;
    }
}

bool Platform::isNativeOutputFormat(uint32_t format) {
    return format == VC_FORMAT_RGBA;
}

uint32_t Platform::getPreferredInputFormat(bool yuv) {
    if (!yuv) return VC_FORMAT_RGBA;
    switch (getCurrentPlatform()) {
        case PLATFORM_TAVRIX3:
        case PLATFORM_TAVRIX4:
            return VC_FORMAT_NV12;
        case PLATFORM_TAVRIX5:
            return isSupported_TAVRIX_NV21_FULL_RANGE() ? VC_FORMAT_NV21 : VC_FORMAT_NV12;
        default:
            return VC_FORMAT_NV21;
    }
}

int Platform::getMaximumTextureSize() {
    if (!sMaxTextureComputed) {
        GLint size = 0;
        GL_CHECK(glGetIntegerv(GL_MAX_TEXTURE_SIZE, &size));
        sMaxTexture = size < 1 ? kDefaultMaximumTextureSize : size;
        sMaxTextureComputed = true;
    }
    return sMaxTexture;
}

VCImage* Platform::lockGraphicBuffer(const android::sp<android::GraphicBuffer>& buffer, int mode,
                                     int format, uint32_t usage) {
    if (buffer == nullptr) return nullptr;
    int pixelFormat = buffer->getPixelFormat();
    if (pixelFormat == kImplementationDefinedFormat) pixelFormat = format;
    uint32_t fourcc = HalPixelFormat::fourccOf(pixelFormat, true);
    if (fourcc == 0) {
        EglLog(VF_LOG_ERROR, "%s: Unsupported pixel format 0x%x", "lockGraphicBuffer", pixelFormat);
        return nullptr;
    }
    int width = (int)buffer->getWidth();
    int height = (int)buffer->getHeight();
    int stride = (int)buffer->getStride();
    // Kept at error level on purpose: it is the one trace of every lock.
    EglLog(VF_LOG_ERROR, "EGL: lockGraphicBuffer format : %x, width : %d, stride : %d", pixelFormat,
           width, stride);

    int platform = getCurrentPlatform();
    if ((platform == PLATFORM_TAVRIX3 || platform == PLATFORM_TAVRIX5) &&
        (fourcc == VC_FORMAT_NV21 || fourcc == VC_FORMAT_NV12)) {
        android_ycbcr ycbcr;
        if (buffer->lockYCbCr(usage, &ycbcr) != android::NO_ERROR) return nullptr;
        unsigned char* luma = static_cast<unsigned char*>(ycbcr.y);
        // The chroma plane starts at the first of its interleaved samples.
        unsigned char* chroma =
            static_cast<unsigned char*>(fourcc == VC_FORMAT_NV21 ? ycbcr.cr : ycbcr.cb);
        VCImage* image = VCImage_createEmpty(width, height, fourcc);
        if (image == nullptr) {
            buffer->unlock();
            return nullptr;
        }
        if (badAddress(luma) || badAddress(chroma)) {
            EglLog(VF_LOG_ERROR,
                   "EGL ERROR: GraphicBuffer::lock returned an invalid address: Y: %p - UV: %p",
                   luma, chroma);
            VCImage_destroy(image);
            buffer->unlock();
            return nullptr;
        }
        image->data = luma;
        image->wrapped = 1;
        image->uvOffset = (uint32_t)(chroma - luma);
        image->size = VCImage_size(image);
        return image;
    }

    VCImage* image = VCImage_createEmpty(width, height, fourcc);
    if (image == nullptr) return nullptr;
    void* address = nullptr;
    if (buffer->lock(usage, &address) != android::NO_ERROR) {
        VCImage_destroy(image);
        return nullptr;
    }
    image->uvOffset = 0;
    image->size = VCImage_size(image);
    unsigned char* locked = static_cast<unsigned char*>(address);
    if (mode == LOCK_COMPACT && stride != width) {
        if (VCImage_allocate(image) < 0) {
            VCImage_destroy(image);
            buffer->unlock();
            return nullptr;
        }
        // size / (width * height) is 1 for 4:2:0 images: only the luma rows
        // are compacted and the chroma part stays as allocated.
        int bytesPerPixel = (int)(image->size / ((uint32_t)width * (uint32_t)height));
        for (int row = 0; row < height; ++row) {
            memcpy(image->data + (size_t)row * width * bytesPerPixel,
                   locked + (size_t)row * stride * bytesPerPixel, (size_t)width * bytesPerPixel);
        }
    } else if (mode == LOCK_COMPACT || mode == LOCK_WRAP || mode == LOCK_WRAP_2) {
        image->data = locked;
        image->wrapped = 1;
    }
    return image;
}

void Platform::setMaximumTextureSizeForTesting(int size) {
    sMaxTexture = size;
    sMaxTextureComputed = true;
}

void Platform::resetForTesting() {
    sPlatformComputed = false;
    sVendorComputed = false;
    sTavrixFullRangeComputed = false;
    sQcomFullRangeComputed = false;
    sMaxTextureComputed = false;
    sPlatform = PLATFORM_UNKNOWN;
    sVendor = VENDOR_UNKNOWN;
    sMaxTexture = kDefaultMaximumTextureSize;
}
