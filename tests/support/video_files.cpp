#include "support/video_files.h"

#include <algorithm>
#include <cmath>

extern "C" {
#include <libavcodec/avcodec.h>
#include <libavformat/avformat.h>
#include <libavutil/pixdesc.h>
#include <libswscale/swscale.h>
}

#include "support/camera_frames.h"

bool VideoFiles_writeGenerated(const std::string& path, int w, int h, int frames, int fps) {
    AVFormatContext* format = nullptr;
    if (avformat_alloc_output_context2(&format, nullptr, "matroska", path.c_str()) < 0)
        return false;
    const AVCodec* codec = avcodec_find_encoder(AV_CODEC_ID_FFV1);
    AVStream* stream = avformat_new_stream(format, nullptr);
    AVCodecContext* encoder = avcodec_alloc_context3(codec);
    AVFrame* frame = av_frame_alloc();
    AVPacket* packet = av_packet_alloc();
    bool ok = codec != nullptr && stream != nullptr && encoder != nullptr;
    if (ok) {
        encoder->width = w;
        encoder->height = h;
        encoder->pix_fmt = AV_PIX_FMT_YUV420P;
        encoder->color_range = AVCOL_RANGE_JPEG;
        encoder->time_base = {1, fps};
        ok = avcodec_open2(encoder, codec, nullptr) >= 0 &&
             avcodec_parameters_from_context(stream->codecpar, encoder) >= 0 &&
             avio_open(&format->pb, path.c_str(), AVIO_FLAG_WRITE) >= 0 &&
             avformat_write_header(format, nullptr) >= 0;
        stream->time_base = encoder->time_base;
    }
    frame->width = w;
    frame->height = h;
    frame->format = AV_PIX_FMT_YUV420P;
    frame->color_range = AVCOL_RANGE_JPEG;
    ok = ok && av_frame_get_buffer(frame, 0) >= 0;
    auto drain = [&] {
        while (avcodec_receive_packet(encoder, packet) == 0) {
            av_packet_rescale_ts(packet, encoder->time_base, stream->time_base);
            packet->stream_index = stream->index;
            av_interleaved_write_frame(format, packet);
        }
    };
    for (int i = 0; ok && i < frames; ++i) {
        std::vector<uint8_t> nv21 = CameraFrames_nv21(i, w, h);
        ok = av_frame_make_writable(frame) >= 0;
        for (int y = 0; ok && y < h; ++y)
            std::copy_n(&nv21[y * w], w, frame->data[0] + y * frame->linesize[0]);
        for (int y = 0; ok && y < h / 2; ++y) {
            for (int x = 0; x < w / 2; ++x) {
                frame->data[2][y * frame->linesize[2] + x] = nv21[w * h + y * w + 2 * x];  // V
                frame->data[1][y * frame->linesize[1] + x] = nv21[w * h + y * w + 2 * x + 1];
            }
        }
        frame->pts = i;
        ok = ok && avcodec_send_frame(encoder, frame) >= 0;
        drain();
    }
    if (ok) {
        avcodec_send_frame(encoder, nullptr);
        drain();
        ok = av_write_trailer(format) >= 0;
    }
    if (format != nullptr && format->pb != nullptr) avio_closep(&format->pb);
    av_packet_free(&packet);
    av_frame_free(&frame);
    avcodec_free_context(&encoder);
    avformat_free_context(format);
    return ok;
}

bool VideoFiles_decode(const std::string& path, DecodedVideo* video) {
    *video = DecodedVideo();
    AVFormatContext* format = nullptr;
    if (avformat_open_input(&format, path.c_str(), nullptr, nullptr) < 0) return false;
    const AVCodec* codec = nullptr;
    AVCodecContext* decoder = nullptr;
    AVFrame* frame = av_frame_alloc();
    AVPacket* packet = av_packet_alloc();
    SwsContext* scaler = nullptr;
    int index = -1;
    bool ok = avformat_find_stream_info(format, nullptr) >= 0 &&
              (index = av_find_best_stream(format, AVMEDIA_TYPE_VIDEO, -1, -1, &codec, 0)) >= 0 &&
              (decoder = avcodec_alloc_context3(codec)) != nullptr &&
              avcodec_parameters_to_context(decoder, format->streams[index]->codecpar) >= 0 &&
              avcodec_open2(decoder, codec, nullptr) >= 0;
    if (ok) video->codec = codec->name;
    const AVRational timeBase = ok ? format->streams[index]->time_base : AVRational{1, 1};
    auto receive = [&]() -> bool {
        while (avcodec_receive_frame(decoder, frame) == 0) {
            const int w = frame->width;
            const int h = frame->height;
            video->width = w;
            video->height = h;
            video->fullRange = frame->color_range == AVCOL_RANGE_JPEG;
            const char* name = av_get_pix_fmt_name((AVPixelFormat)frame->format);
            video->pixelFormat = name != nullptr ? name : "";
            // The range is set below; the full-range alias only makes swscale warn.
            AVPixelFormat in = (AVPixelFormat)frame->format;
            if (in == AV_PIX_FMT_YUVJ420P) in = AV_PIX_FMT_YUV420P;
            scaler = sws_getCachedContext(scaler, w, h, in, w, h, AV_PIX_FMT_RGBA,
                                          SWS_BILINEAR | SWS_FULL_CHR_H_INT | SWS_ACCURATE_RND,
                                          nullptr, nullptr, nullptr);
            if (scaler == nullptr) return false;
            const int* matrix = sws_getCoefficients(SWS_CS_ITU601);
            sws_setColorspaceDetails(scaler, matrix, video->fullRange ? 1 : 0, matrix, 1, 0,
                                     1 << 16, 1 << 16);
            std::vector<uint8_t> rgba((size_t)w * h * 4);
            uint8_t* planes[4] = {rgba.data(), nullptr, nullptr, nullptr};
            const int strides[4] = {w * 4, 0, 0, 0};
            sws_scale(scaler, frame->data, frame->linesize, 0, h, planes, strides);
            video->rgba.push_back(std::move(rgba));
            if (frame->format == AV_PIX_FMT_YUV420P || frame->format == AV_PIX_FMT_YUVJ420P) {
                std::vector<uint8_t> i420;
                for (int p = 0; p < 3; ++p) {
                    const int pw = p == 0 ? w : w / 2;
                    const int ph = p == 0 ? h : h / 2;
                    for (int y = 0; y < ph; ++y) {
                        const uint8_t* row = frame->data[p] + (size_t)y * frame->linesize[p];
                        i420.insert(i420.end(), row, row + pw);
                    }
                }
                video->i420.push_back(std::move(i420));
            }
            const int64_t pts = frame->best_effort_timestamp;
            video->seconds.push_back(pts == AV_NOPTS_VALUE ? -1.0 : pts * av_q2d(timeBase));
        }
        return true;
    };
    while (ok && av_read_frame(format, packet) >= 0) {
        if (packet->stream_index == index) {
            int sent = avcodec_send_packet(decoder, packet);
            // A decoder with frames to give back first takes the packet after.
            while (sent == AVERROR(EAGAIN) && (ok = receive())) {
                sent = avcodec_send_packet(decoder, packet);
            }
            ok = ok && sent >= 0;
        }
        av_packet_unref(packet);
        ok = ok && receive();
    }
    if (ok) {
        avcodec_send_packet(decoder, nullptr);
        ok = receive();
    }
    sws_freeContext(scaler);
    av_packet_free(&packet);
    av_frame_free(&frame);
    avcodec_free_context(&decoder);
    avformat_close_input(&format);
    return ok;
}

std::vector<uint8_t> VideoFiles_generatedI420(uint64_t index, int w, int h) {
    const std::vector<uint8_t> nv21 = CameraFrames_nv21(index, w, h);
    std::vector<uint8_t> i420(nv21.begin(), nv21.begin() + (size_t)w * h);
    const size_t quarter = (size_t)(w / 2) * (h / 2);
    i420.resize((size_t)w * h + 2 * quarter);
    for (size_t i = 0; i < quarter; ++i) {
        i420[(size_t)w * h + i] = nv21[(size_t)w * h + 2 * i + 1];        // U
        i420[(size_t)w * h + quarter + i] = nv21[(size_t)w * h + 2 * i];  // V
    }
    return i420;
}

double VideoFiles_psnr(const std::vector<uint8_t>& a, const std::vector<uint8_t>& b, int channels) {
    if (a.size() != b.size() || a.empty()) return 0;
    double sum = 0;
    size_t count = 0;
    for (size_t i = 0; i < a.size(); ++i) {
        if (channels == 4 && i % 4 == 3) continue;  // alpha
        const double d = (double)a[i] - (double)b[i];
        sum += d * d;
        ++count;
    }
    if (sum == 0) return 99;
    return 10 * std::log10(255.0 * 255.0 / (sum / count));
}
