// What the device is: application-processor family and chip vendor (from the
// system properties ro.board.platform and ro.chipname), the camera formats
// the GPU path takes natively, full-range NV21 support and the largest
// texture. Answers are computed on first use and kept for the process.
// Also locks a platform graphic buffer and describes it as a VCImage.
#ifndef CORE_EGL_PLATFORM_H
#define CORE_EGL_PLATFORM_H

#include <stdint.h>

#include <utils/StrongPointer.h>

#include "vccore/vc_image.h"

namespace android {
class GraphicBuffer;
}

class Platform {
public:
    enum PLATFORM {
        PLATFORM_UNKNOWN = 0,
        PLATFORM_TAVRIX3 = 1,
        PLATFORM_TAVRIX4 = 2,
        PLATFORM_TAVRIX5 = 3,
        PLATFORM_MSM8952 = 4,
        PLATFORM_MSM8960 = 5,
        PLATFORM_MSM8974 = 6,
        PLATFORM_MSM8976 = 7,
        PLATFORM_MSM8992 = 8,
        PLATFORM_MSM8994 = 9,
        PLATFORM_APQ8084 = 10,
    };

    enum VENDOR {
        VENDOR_UNKNOWN = 0,
        VENDOR_KVAR = 1,
        VENDOR_QCOM = 2,
    };

    // Lock modes of lockGraphicBuffer().
    enum LOCK_MODE {
        LOCK_COMPACT = 0,  // copy into a compact image when the stride differs from the width
        LOCK_WRAP = 1,
        LOCK_WRAP_2 = 2,
    };

    // The implementation-defined pixel format, replaced by lockGraphicBuffer's
    // format argument.
    static const int kImplementationDefinedFormat = 34;
    // Software read-often | write-often.
    static const uint32_t kLockUsage = 0x33;
    static const int kDefaultMaximumTextureSize = 4096;

    static int getCurrentPlatform();
    static int getCurrentVendor();
    static bool isSupported_TAVRIX_NV21_FULL_RANGE();
    static bool isSupported_QCOM_NV21_FULL_RANGE();
    static bool isNativeInputFormat(uint32_t format);
    static bool isNativeOutputFormat(uint32_t format);
    static uint32_t getPreferredInputFormat(bool yuv);
    // Needs a current GL context on the first call.
    static int getMaximumTextureSize();

    // A new image over the locked buffer (the caller unlocks the buffer and
    // destroys the image), or null. `usage` is the lock's software usage.
    static VCImage* lockGraphicBuffer(const android::sp<android::GraphicBuffer>& buffer, int mode,
                                      int format, uint32_t usage = kLockUsage);

    // Forgets every cached answer, so tests can change the properties.
    static void resetForTesting();
    // Answers size for the largest texture until the next reset, so tests
    // can play a small GPU.
    static void setMaximumTextureSizeForTesting(int size);
};

#endif
