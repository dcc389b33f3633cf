// H.264 (libx264) in an MP4 file through FFmpeg: the file and codec half of
// the host's video encoder. Pictures come in as full-range planar 4:2:0
// (the image core's YUVP), tagged as such in the stream, with presentation
// times in 1/90000 s; one thread at a time.
#ifndef KIV_HOST_MEDIA_MP4VIDEOWRITER_H
#define KIV_HOST_MEDIA_MP4VIDEOWRITER_H

#include <stdint.h>

#include <string>

struct AVCodecContext;
struct AVFormatContext;
struct AVFrame;
struct AVPacket;
struct AVStream;

namespace kivhost {

struct VideoEncoderSettings;

class Mp4VideoWriter {
public:
    // Presentation times count in these units a second.
    static constexpr int kTimeScale = 90000;

    Mp4VideoWriter() = default;
    // An open file without finish() is closed as it is (not playable).
    ~Mp4VideoWriter();

    // Creates the file and starts the encoder: 0, VC_ERROR_UNSUPPORTED
    // (no libx264), VC_ERROR_IO_FAILED or VC_ERROR_CODEC_FAILED (logged).
    int open(const std::string& path, const VideoEncoderSettings& settings);
    // A frame of the writer's pool for the next picture: its YUVP bytes are
    // data[0], tightly packed. Null when none can be had.
    AVFrame* newFrame();
    static void freeFrame(AVFrame* frame);
    // Encodes one picture (pts in kTimeScale units, increasing) and writes
    // what the encoder gives back; 0 or VC_ERROR_CODEC_FAILED /
    // VC_ERROR_IO_FAILED (logged).
    int write(AVFrame* frame, int64_t pts);
    // Drains the encoder and writes the file's index: 0 or an error (logged).
    int finish();

    Mp4VideoWriter(const Mp4VideoWriter&) = delete;
    Mp4VideoWriter& operator=(const Mp4VideoWriter&) = delete;

private:
    int drain();
    void close();

    int mWidth = 0;
    int mHeight = 0;
    std::string mPath;
    AVFormatContext* mFormat = nullptr;
    AVCodecContext* mCodec = nullptr;
    AVStream* mStream = nullptr;
    AVPacket* mPacket = nullptr;
    bool mHeaderWritten = false;
};

}  // namespace kivhost

#endif
