// The converters that feed a frame listener in the pixel format it prefers.
#ifndef CORE_EGL_IMAGECONVERTER_H
#define CORE_EGL_IMAGECONVERTER_H

#include <stdint.h>
#include <utils/RefBase.h>
#include <utils/Timers.h>

#include "kivimaging/OnFrameListener.h"
#include "vccore/vc_image.h"

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
