extern "C" {
#include <libavcodec/avcodec.h>
#include <libavformat/avformat.h>
#include <libavutil/imgutils.h>
#include <libavutil/opt.h>
}

#include <algorithm>
#include <cmath>

#include "host/media/Mp4VideoWriter.h"
#include "kivhost/VideoEncoder.h"
#include "vccore/vc_error.h"
#include "vccore/vc_log.h"

#define VC_SOURCE "host/video/FfmpegMp4Writer"

namespace kivhost {

namespace {

std::string avError(int code) {
    char text[AV_ERROR_MAX_STRING_SIZE] = {0};
    av_strerror(code, text, sizeof(text));
    return text;
}

class FfmpegMp4Writer : public Mp4VideoWriter {
public:
    ~FfmpegMp4Writer() override { close(); }
    int open(const std::string& path, const VideoEncoderSettings& settings) override;
    AVFrame* newFrame() override;
    void freeFrame(AVFrame* frame) override { av_frame_free(&frame); }
    unsigned char* pixels(AVFrame* frame) override { return frame->data[0]; }
    bool writable(AVFrame* frame) override { return av_frame_is_writable(frame) != 0; }
    int write(AVFrame* frame, int64_t pts) override;
    int finish() override;

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

}  // namespace

void FfmpegMp4Writer::close() {
    if (mFormat != nullptr && mFormat->pb != nullptr) avio_closep(&mFormat->pb);
    avformat_free_context(mFormat);
    mFormat = nullptr;
    mStream = nullptr;
    avcodec_free_context(&mCodec);
    av_packet_free(&mPacket);
}

int FfmpegMp4Writer::open(const std::string& path, const VideoEncoderSettings& settings) {
    mWidth = settings.width;
    mHeight = settings.height;
    mPath = path;
    const AVCodec* codec = avcodec_find_encoder_by_name("libx264");
    if (codec == nullptr) {
        VF_LogMsg(VF_LOG_ERROR, "VideoEncoder: no libx264 encoder in this FFmpeg");
        return VC_REPORT(VC_ERROR_UNSUPPORTED);
    }
    int result = avformat_alloc_output_context2(&mFormat, nullptr, "mp4", path.c_str());
    if (result < 0 || (mStream = avformat_new_stream(mFormat, nullptr)) == nullptr) {
        VF_LogMsg(VF_LOG_ERROR, "VideoEncoder: cannot make an MP4 stream: %s",
                  avError(result).c_str());
        return VC_REPORT(VC_ERROR_CODEC_FAILED);
    }
    mCodec = avcodec_alloc_context3(codec);
    mPacket = av_packet_alloc();
    if (mCodec == nullptr || mPacket == nullptr) return VC_REPORT(VC_ERROR_ALLOC_FAILED);
    mCodec->width = mWidth;
    mCodec->height = mHeight;
    mCodec->pix_fmt = AV_PIX_FMT_YUV420P;
    // The image core's YUV is full range (BT.601 matrix); say so, so that
    // players do not stretch it a second time.
    mCodec->color_range = AVCOL_RANGE_JPEG;
    mCodec->colorspace = AVCOL_SPC_BT470BG;
    mCodec->time_base = {1, kTimeScale};
    mCodec->framerate = av_d2q(settings.fps, 100000);
    // A key frame every two seconds keeps the file seekable.
    mCodec->gop_size = std::max(1, (int)std::lround(settings.fps * 2));
    mCodec->thread_count = settings.threads;
    if (mFormat->oformat->flags & AVFMT_GLOBALHEADER) mCodec->flags |= AV_CODEC_FLAG_GLOBAL_HEADER;
    av_opt_set(mCodec->priv_data, "preset", settings.preset.c_str(), 0);
    av_opt_set_int(mCodec->priv_data, "crf", settings.crf, 0);
    result = avcodec_open2(mCodec, codec, nullptr);
    if (result < 0) {
        VF_LogMsg(VF_LOG_ERROR, "VideoEncoder: cannot start libx264 (preset %s, crf %d): %s",
                  settings.preset.c_str(), settings.crf, avError(result).c_str());
        return VC_REPORT(VC_ERROR_CODEC_FAILED);
    }
    mStream->time_base = mCodec->time_base;
    mStream->avg_frame_rate = mCodec->framerate;
    if (avcodec_parameters_from_context(mStream->codecpar, mCodec) < 0) {
        return VC_REPORT(VC_ERROR_CODEC_FAILED);
    }
    result = avio_open(&mFormat->pb, path.c_str(), AVIO_FLAG_WRITE);
    if (result < 0) {
        VF_LogMsg(VF_LOG_ERROR, "VideoEncoder: cannot write %s: %s", path.c_str(),
                  avError(result).c_str());
        return VC_REPORT(VC_ERROR_IO_FAILED);
    }
    result = avformat_write_header(mFormat, nullptr);
    if (result < 0) {
        VF_LogMsg(VF_LOG_ERROR, "VideoEncoder: cannot write %s: %s", path.c_str(),
                  avError(result).c_str());
        return VC_REPORT(VC_ERROR_IO_FAILED);
    }
    mHeaderWritten = true;
    return 0;
}

AVFrame* FfmpegMp4Writer::newFrame() {
    AVFrame* frame = av_frame_alloc();
    if (frame == nullptr) return nullptr;
    frame->width = mWidth;
    frame->height = mHeight;
    frame->format = AV_PIX_FMT_YUV420P;
    frame->color_range = AVCOL_RANGE_JPEG;
    frame->colorspace = AVCOL_SPC_BT470BG;
    // One block, planes back to back with rows unpadded: the image core's
    // YUVP layout, so a conversion writes straight into the frame.
    const int size = av_image_get_buffer_size(AV_PIX_FMT_YUV420P, mWidth, mHeight, 1);
    frame->buf[0] = size > 0 ? av_buffer_alloc((size_t)size) : nullptr;
    if (frame->buf[0] == nullptr ||
        av_image_fill_arrays(frame->data, frame->linesize, frame->buf[0]->data, AV_PIX_FMT_YUV420P,
                             mWidth, mHeight, 1) < 0) {
        av_frame_free(&frame);
        return nullptr;
    }
    return frame;
}

int FfmpegMp4Writer::write(AVFrame* frame, int64_t pts) {
    frame->pts = pts;
    const int result = avcodec_send_frame(mCodec, frame);
    if (result < 0) {
        VF_LogMsg(VF_LOG_ERROR, "VideoEncoder: libx264 refused a frame: %s",
                  avError(result).c_str());
        return VC_REPORT(VC_ERROR_CODEC_FAILED);
    }
    return drain();
}

int FfmpegMp4Writer::drain() {
    for (;;) {
        int result = avcodec_receive_packet(mCodec, mPacket);
        if (result == AVERROR(EAGAIN) || result == AVERROR_EOF) return 0;
        if (result < 0) {
            VF_LogMsg(VF_LOG_ERROR, "VideoEncoder: libx264 failed: %s", avError(result).c_str());
            return VC_REPORT(VC_ERROR_CODEC_FAILED);
        }
        av_packet_rescale_ts(mPacket, mCodec->time_base, mStream->time_base);
        mPacket->stream_index = mStream->index;
        result = av_interleaved_write_frame(mFormat, mPacket);
        if (result < 0) {
            VF_LogMsg(VF_LOG_ERROR, "VideoEncoder: cannot write %s: %s", mPath.c_str(),
                      avError(result).c_str());
            return VC_REPORT(VC_ERROR_IO_FAILED);
        }
    }
}

int FfmpegMp4Writer::finish() {
    if (!mHeaderWritten) return VC_REPORT(VC_ERROR_INVALID_STATE);
    mHeaderWritten = false;
    int status = avcodec_send_frame(mCodec, nullptr) < 0 ? VC_REPORT(VC_ERROR_CODEC_FAILED) : 0;
    if (status == 0) status = drain();
    const int trailer = av_write_trailer(mFormat);
    if (status == 0 && trailer < 0) {
        VF_LogMsg(VF_LOG_ERROR, "VideoEncoder: cannot finish %s: %s", mPath.c_str(),
                  avError(trailer).c_str());
        status = VC_REPORT(VC_ERROR_IO_FAILED);
    }
    close();
    return status;
}

Mp4VideoWriter* FfmpegMp4Writer_create() {
    return new FfmpegMp4Writer();
}

}  // namespace kivhost
