// Video files in tests, made and read with FFmpeg directly (independently of
// the host's video encoder): a lossless clip of the virtual camera's
// generator frames, and any video decoded back to RGBA pictures.
#ifndef KIV_TESTS_SUPPORT_VIDEO_FILES_H
#define KIV_TESTS_SUPPORT_VIDEO_FILES_H

#include <cstdint>
#include <string>
#include <vector>

// Writes generator frames 0..frames-1 as a lossless full-range FFV1 video
// (Matroska) at `fps`.
bool VideoFiles_writeGenerated(const std::string& path, int width, int height, int frames,
                               int fps = 30);

struct DecodedVideo {
    std::string codec;  // the decoder's name ("h264")
    std::string pixelFormat;
    bool fullRange = false;
    int width = 0;
    int height = 0;
    std::vector<double> seconds;             // presentation time of each frame
    std::vector<std::vector<uint8_t>> rgba;  // each frame, rows top first
    // Each frame as decoded, packed I420 (Y, U, V planes), for 4:2:0 streams.
    std::vector<std::vector<uint8_t>> i420;
};

// Every frame of the first video stream in presentation order, converted to
// RGBA by swscale with the stream's own range and BT.601 matrix. False when
// the file cannot be read (the frames read so far stay in *video).
bool VideoFiles_decode(const std::string& path, DecodedVideo* video);

// The generator's frame `index` as packed I420 (what a 4:2:0 stream of it holds).
std::vector<uint8_t> VideoFiles_generatedI420(uint64_t index, int width, int height);

// Peak signal-to-noise ratio (dB) of two pictures of `channels` bytes a
// pixel, over every byte (channels 1) or the colour bytes of RGBA
// (channels 4); 0 when their sizes differ, 99 when they are equal.
double VideoFiles_psnr(const std::vector<uint8_t>& a, const std::vector<uint8_t>& b, int channels);

#endif
