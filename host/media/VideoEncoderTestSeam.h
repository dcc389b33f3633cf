// What tests of the host video encoder reach beyond its interface: holding
// its encoding thread, so that a backlog builds up without racing the clock.
#ifndef KIV_HOST_MEDIA_VIDEOENCODERTESTSEAM_H
#define KIV_HOST_MEDIA_VIDEOENCODERTESTSEAM_H

#include "kivhost/VideoEncoder.h"

namespace kivhost {

class VideoEncoderTestSeam {
public:
    // While held, frames taken off the queue wait for the encoder; close()
    // lets go.
    static void hold(VideoEncoder& encoder, bool held);
    // Frames taken off the queue so far (encoded, waiting or dropped).
    static uint64_t taken(VideoEncoder& encoder);
};

}  // namespace kivhost

#endif
