// The receiving end of finished frames (pictures, snapshots, preview frames
// handed to the application). A client implements it; the library never owns
// a listener, which must outlive every frame it has been handed to.
#ifndef KIVIMAGING_ONFRAMELISTENER_H
#define KIVIMAGING_ONFRAMELISTENER_H

#include <stdint.h>

#include "vccore/vc_image.h"

class OnFrameListener {
public:
    virtual ~OnFrameListener() {}
    // The image stays the caller's and is valid only during the call;
    // timestamp in nanoseconds.
    virtual void onFrameProcessed(const VCImage& image, long long timestamp) = 0;
    virtual uint32_t getPreferredFormat() { return VC_FORMAT_NV21; }
    // Left to the listeners' own use; the library never asks it.
    virtual int getListenerFlags() { return 0; }
    // A frame that could not be delivered: a VC_ERROR_* code and a short text.
    virtual void onProcessingError(int code, const char* message) {
        (void)code;
        (void)message;
    }
};

#endif
