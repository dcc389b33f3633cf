// A video encoder for a Linux host, in the place a device's MediaCodec input
// surface takes: a buffer queue whose producer the recorder draws into, and
// whose consumer encodes every queued frame with libx264 (yuv420p, full
// range) into an MP4 file, each frame presented at its own timestamp
// relative to the first.
//
// Two threads of its own: one takes each frame off the queue, converts it
// to 4:2:0 with the image core and gives the buffer back at once, so the
// producer seldom waits; the other encodes and writes. When the encoder
// falls behind by more than `backlog` frames, new frames are dropped (and
// counted) rather than holding up the producer. close() abandons the queue,
// so the producer sees NO_INIT from then on, as with a released encoder.
#ifndef KIVHOST_VIDEOENCODER_H
#define KIVHOST_VIDEOENCODER_H

#include <stdint.h>

#include <memory>
#include <string>

#include <gui/IGraphicBufferProducer.h>
#include <utils/StrongPointer.h>

namespace kivhost {

// FFmpeg's own messages: errors only, or its information too. Holds for the
// host video library whenever it is loaded (it is loaded on first use, by
// the first video read or encoder opened).
void HostVideo_setVerbose(bool verbose);

struct VideoEncoderSettings {
    // Even, at least 2x2: the queue's default buffer size.
    int width = 1280;
    int height = 720;
    // The rate the encoder's rate control plans for and the file announces;
    // frames keep their own timestamps.
    double fps = 24;
    // libx264's constant rate factor and speed preset.
    int crf = 20;
    std::string preset = "veryfast";
    // libx264's threads, 0 for its own choice.
    int threads = 0;
    // Frames taken off the queue and waiting for the encoder before more
    // are dropped.
    int backlog = 8;
};

struct VideoEncoderStats {
    uint64_t queued = 0;   // frames the producer queued
    uint64_t encoded = 0;  // frames handed to libx264 (all in the file after close())
    // Frames queued but not encoded: the encoder was behind, the frame did
    // not fit the video, encoding had failed, or close() came first.
    uint64_t dropped = 0;
    // Time spent on the frames encoded: conversion on the intake thread,
    // encoding and writing on the encoder's thread (ns, steady clock).
    int64_t convertNanos = 0;
    int64_t encodeNanos = 0;
};

class VideoEncoderTestSeam;

class VideoEncoder {
public:
    // Creates `path` (an MP4) and starts the threads; null with *status set
    // (VC_ERROR_INVALID_SIZE, VC_ERROR_INVALID_PARAM, VC_ERROR_UNSUPPORTED,
    // VC_ERROR_IO_FAILED, VC_ERROR_CODEC_FAILED; logged).
    static std::unique_ptr<VideoEncoder> open(const std::string& path,
                                              const VideoEncoderSettings& settings,
                                              int* status = nullptr);
    // Closes if close() was not called.
    ~VideoEncoder();

    // What the recorder draws into (a Surface on it, or the manager's
    // recording window).
    android::sp<android::IGraphicBufferProducer> getProducer() const { return mProducer; }

    // Abandons the queue, encodes the frames already taken, and finishes the
    // file: 0, or the first encoding or writing error. Once only; later
    // calls return the same status.
    int close();

    VideoEncoderStats stats() const;
    // Encoding or writing failed; the queue was abandoned then.
    bool failed() const;
    const VideoEncoderSettings& settings() const { return mSettings; }
    const std::string& path() const { return mPath; }

    VideoEncoder(const VideoEncoder&) = delete;
    VideoEncoder& operator=(const VideoEncoder&) = delete;

    // The threads' shared state, which the queue's callbacks may outlive us to see.
    struct State;

private:
    friend class VideoEncoderTestSeam;

    VideoEncoder(const std::string& path, const VideoEncoderSettings& settings);
    int start();
    void intakeLoop();
    void encodeLoop();
    bool takeFrame();
    void fail(int status);
    void abandonQueue();

    const std::string mPath;
    const VideoEncoderSettings mSettings;
    android::sp<android::IGraphicBufferProducer> mProducer;
    std::shared_ptr<State> mState;
};

}  // namespace kivhost

#endif
