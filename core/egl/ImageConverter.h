// The receiving end of finished frames, and the converters that feed it in
// the pixel format it prefers.
#ifndef CORE_EGL_IMAGECONVERTER_H
#define CORE_EGL_IMAGECONVERTER_H

#include <stdint.h>
#include <utils/RefBase.h>
#include <utils/Timers.h>

#include "vccore/vc_image.h"

// Listeners are never owned by the converters; a listener must outlive every
// frame it has been handed to.
class OnFrameListener {
public:
    virtual ~OnFrameListener() {}
    // The image stays the caller's and is valid only during the call;
    // timestamp in nanoseconds.
    virtual void onFrameProcessed(const VCImage& image, long long timestamp) = 0;
    virtual uint32_t getPreferredFormat() { return VC_FORMAT_NV21; }
    // Left to the listeners' own use; the converters never ask it.
    virtual int getListenerFlags() { return 0; }
    // A frame that could not be delivered: a VC_ERROR_* code and a short text.
    virtual void onProcessingError(int code, const char* message) {
        (void)code;
        (void)message;
    }
};

class ImageConverter : public virtual android::RefBase {
public:
    // Converts image to the listener's preferred format and posts it. With
    // takeOwnership the converter destroys image, whatever the outcome;
    // otherwise the caller keeps it. 0 or a negative status.
    virtual int convertAndPost(VCImage* image, OnFrameListener& listener, nsecs_t timestamp,
                               bool takeOwnership) = 0;

protected:
    ImageConverter() {}
    virtual ~ImageConverter() {}
};

#endif
