// H.264 (libx264) in an MP4 file: the file and codec half of the host's
// video encoder. Pictures come in as full-range planar 4:2:0 (the image
// core's YUVP), with presentation times in 1/90000 s; one thread at a time.
// FFmpeg does the work inside the host video library (HostVideoLibrary.h),
// so frames are opaque here.
#ifndef KIV_HOST_MEDIA_MP4VIDEOWRITER_H
#define KIV_HOST_MEDIA_MP4VIDEOWRITER_H

#include <stdint.h>

#include <string>

struct AVFrame;

namespace kivhost {

struct VideoEncoderSettings;

class Mp4VideoWriter {
public:
    // Presentation times count in these units a second.
    static constexpr int kTimeScale = 90000;

    // An open file without finish() is closed as it is (not playable).
    virtual ~Mp4VideoWriter() = default;

    // Creates the file and starts the encoder: 0, VC_ERROR_UNSUPPORTED
    // (no libx264), VC_ERROR_IO_FAILED or VC_ERROR_CODEC_FAILED (logged).
    virtual int open(const std::string& path, const VideoEncoderSettings& settings) = 0;
    // A frame of the writer's size for the next picture; null when none can
    // be had. Frames may outlive finish(), not the writer.
    virtual AVFrame* newFrame() = 0;
    virtual void freeFrame(AVFrame* frame) = 0;
    // The frame's YUVP bytes, tightly packed.
    virtual unsigned char* pixels(AVFrame* frame) = 0;
    // False while the encoder still holds the frame's pixels.
    virtual bool writable(AVFrame* frame) = 0;
    // Encodes one picture (pts in kTimeScale units, increasing) and writes
    // what the encoder gives back; 0 or VC_ERROR_CODEC_FAILED /
    // VC_ERROR_IO_FAILED (logged).
    virtual int write(AVFrame* frame, int64_t pts) = 0;
    // Drains the encoder and writes the file's index: 0 or an error (logged).
    virtual int finish() = 0;
};

}  // namespace kivhost

#endif
