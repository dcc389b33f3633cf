// A video file as camera frames: FFmpeg demuxes and decodes it, and swscale
// scales each picture to the camera's size as full-range NV21 (the range the
// image core's conversions take), expanding a limited-range stream.
extern "C" {
#include <libavcodec/avcodec.h>
#include <libavformat/avformat.h>
#include <libavutil/imgutils.h>
#include <libswscale/swscale.h>
}

#include "kivhost/VirtualCamera.h"
#include "vccore/vc_log.h"

namespace kivhost {

namespace {

class Video : public VirtualCameraSource {
public:
    Video(int width, int height, bool loop) : mWidth(width), mHeight(height), mLoop(loop) {}

    ~Video() override {
        sws_freeContext(mScaler);
        av_frame_free(&mFrame);
        av_packet_free(&mPacket);
        avcodec_free_context(&mDecoder);
        avformat_close_input(&mFormat);
    }

    bool open(const std::string& path) {
        if (avformat_open_input(&mFormat, path.c_str(), nullptr, nullptr) < 0 ||
            avformat_find_stream_info(mFormat, nullptr) < 0) {
            return fail("cannot open the video", path);
        }
        const AVCodec* codec = nullptr;
        mStream = av_find_best_stream(mFormat, AVMEDIA_TYPE_VIDEO, -1, -1, &codec, 0);
        if (mStream < 0 || codec == nullptr) return fail("no video stream in", path);
        mDecoder = avcodec_alloc_context3(codec);
        if (mDecoder == nullptr ||
            avcodec_parameters_to_context(mDecoder, mFormat->streams[mStream]->codecpar) < 0 ||
            avcodec_open2(mDecoder, codec, nullptr) < 0) {
            return fail("cannot decode the video", path);
        }
        mFrame = av_frame_alloc();
        mPacket = av_packet_alloc();
        return mFrame != nullptr && mPacket != nullptr;
    }

    bool render(uint64_t, VCImage* frame) override {
        for (int restarts = 0; restarts < 2; ++restarts) {
            if (decodeNext()) return toNv21(frame);
            // The end: from the start again, unless the video had no frame at all.
            if (!mLoop || !mDecodedAny) return false;
            av_seek_frame(mFormat, mStream, 0, AVSEEK_FLAG_BACKWARD);
            avcodec_flush_buffers(mDecoder);
            mDraining = false;
        }
        return false;
    }

private:
    bool fail(const char* what, const std::string& path) {
        VF_LogMsg(VF_LOG_ERROR, "VirtualCamera: %s %s", what, path.c_str());
        return false;
    }

    // The next decoded picture into mFrame; false at the end of the stream.
    bool decodeNext() {
        for (;;) {
            const int got = avcodec_receive_frame(mDecoder, mFrame);
            if (got == 0) {
                mDecodedAny = true;
                return true;
            }
            if (got == AVERROR_EOF || (got != AVERROR(EAGAIN))) return false;
            if (mDraining) return false;
            const int read = av_read_frame(mFormat, mPacket);
            if (read < 0) {
                mDraining = true;
                avcodec_send_packet(mDecoder, nullptr);
                continue;
            }
            if (mPacket->stream_index == mStream) avcodec_send_packet(mDecoder, mPacket);
            av_packet_unref(mPacket);
        }
    }

    bool toNv21(VCImage* frame) {
        mScaler = sws_getCachedContext(mScaler, mFrame->width, mFrame->height,
                                       (AVPixelFormat)mFrame->format, mWidth, mHeight,
                                       AV_PIX_FMT_NV21, SWS_BILINEAR, nullptr, nullptr, nullptr);
        if (mScaler == nullptr) return false;
        const int* coefficients = sws_getCoefficients(SWS_CS_ITU601);
        const int fullIn = mFrame->color_range == AVCOL_RANGE_JPEG ? 1 : 0;
        sws_setColorspaceDetails(mScaler, coefficients, fullIn, coefficients, 1, 0, 1 << 16,
                                 1 << 16);
        uint8_t* planes[4] = {frame->data, frame->data + (size_t)mWidth * mHeight, nullptr,
                              nullptr};
        const int strides[4] = {mWidth, mWidth, 0, 0};
        return sws_scale(mScaler, mFrame->data, mFrame->linesize, 0, mFrame->height, planes,
                         strides) == mHeight;
    }

    const int mWidth;
    const int mHeight;
    const bool mLoop;
    AVFormatContext* mFormat = nullptr;
    AVCodecContext* mDecoder = nullptr;
    AVFrame* mFrame = nullptr;
    AVPacket* mPacket = nullptr;
    SwsContext* mScaler = nullptr;
    int mStream = -1;
    bool mDraining = false;
    bool mDecodedAny = false;
};

}  // namespace

VirtualCameraSource* VideoSource_open(const char* path, int width, int height, bool loop) {
    if (width < 2 || height < 2 || ((width | height) & 1) != 0) return nullptr;
    std::unique_ptr<Video> source(new Video(width, height, loop));
    if (!source->open(path)) return nullptr;
    return source.release();
}

}  // namespace kivhost
