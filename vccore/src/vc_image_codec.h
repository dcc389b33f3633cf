// Codec back ends shared by the JPEG, PNG and file functions of the image core.
#ifndef VCCORE_VC_IMAGE_CODEC_H
#define VCCORE_VC_IMAGE_CODEC_H

#include <stddef.h>
#include <stdint.h>

#include <functional>
#include <memory>

#include "vccore/vc_image.h"
#include "vccore/vc_picture.h"
#include "vccore/vc_stream.h"

// The platform's fast JPEG codec, opened at run time when installed.
#define VC_FAST_JPEG_LIBRARY "libkivjpeginterface.so"
#define VC_FAST_JPEG_ENCODE "fastJpegEncode"
#define VC_FAST_JPEG_DECODE "fastJpegDecode"

extern "C" {
// A malloc'ed JPEG stream (length through `length`) or null.
typedef unsigned char* (*VCFastJpegEncode_t)(const unsigned char* pixels, uint32_t size, int width,
                                             int height, uint32_t format, uint32_t* length,
                                             int quality);
// Malloc'ed pixels in `format` (width and height through the pointers) or null.
typedef unsigned char* (*VCFastJpegDecode_t)(const unsigned char* bytes, uint32_t length,
                                             int* width, int* height, uint32_t format);
}

// TurboJPEG settings of the general codec; the benchmark and the tests hand
// the same ones to TurboJPEG. Decoding stops at the first warning, so
// truncated and corrupt streams fail instead of yielding grey-filled
// pictures, and scan counts are bounded (the decoder, on libjpeg's scanline
// interface, applies these rules itself).
#define VC_JPEG_DECODE_FLAGS (TJFLAG_STOPONWARNING | TJFLAG_LIMITSCANS)
#define VC_JPEG_ENCODE_FLAGS 0
#define VC_JPEG_SUBSAMPLING TJSAMP_420

// One decoding of a compressed picture by the general decoders: the header
// first, then straight-alpha RGBA pixels (stride width·4), whole or in bands
// of rows. Nothing is logged.
class VCPictureReader {
public:
    virtual ~VCPictureReader() = default;
    virtual bool readHeader(int* width, int* height) = 0;
    // Only after a successful readHeader; rgba holds width·height·4 bytes.
    virtual bool readRgba(unsigned char* rgba) = 0;
    // Only after a successful readHeader, instead of readRgba: decodes `rows`
    // rows at a time (fewer in the last band) into `rgba`, which holds that
    // many, and calls band(firstRow, count) after each. False when decoding
    // or a band fails.
    virtual bool readRgbaBands(unsigned char* rgba, int rows,
                               const std::function<bool(int, int)>& band) = 0;
    // Readers that can decode straight into the caller's memory: as
    // readRgbaBands, but each band goes where place(firstRow, count) says,
    // rows `pitch` bytes apart (a null place stops it, returning false).
    virtual bool decodesInPlace() const { return false; }
    virtual bool readRgbaBandsInPlace(int rows, size_t pitch,
                                      const std::function<unsigned char*(int, int)>& place,
                                      const std::function<bool(int, int)>& band) {
        (void)rows;
        (void)pitch;
        (void)place;
        (void)band;
        return false;
    }
    // Why the last call returned false; VC_DECODE_OK when it was a band's
    // own refusal.
    virtual VCDecodeFailure failure() const = 0;
};

// Calls band(firstRow, count) for `height` rows taken `rows` at a time (fewer
// in the last band), stopping at the first false.
inline bool VCPictureReader_forEachBand(int height, int rows,
                                        const std::function<bool(int, int)>& band) {
    for (int first = 0; first < height; first += rows) {
        if (!band(first, height - first < rows ? height - first : rows)) return false;
    }
    return true;
}

// Encoded bytes as a reader takes them: a whole buffer, or pulled from a
// source as the decoding goes (the first bytes, read to tell the format,
// given back first).
struct VCByteInput {
    const unsigned char* bytes = nullptr;
    size_t length = 0;
    VCStreamSource source = nullptr;
    void* user = nullptr;
    unsigned char head[8] = {};
    size_t headLength = 0;
    size_t headUsed = 0;
    bool failed = false;  // the source could not be read

    bool pulled() const { return source != nullptr; }
    // From a source: up to `count` bytes, fewer only at its end or failure.
    size_t pull(unsigned char* to, size_t count);
};

// A reader for JPEG or PNG data, null for anything else (a source's first
// bytes are read to tell).
std::unique_ptr<VCPictureReader> VCPictureReader_create(const unsigned char* bytes, size_t length);
std::unique_ptr<VCPictureReader> VCPictureReader_create(VCByteInput input);
std::unique_ptr<VCPictureReader> VCJpegReader_create(const VCByteInput& input);
std::unique_ptr<VCPictureReader> VCPngReader_create(const VCByteInput& input);

// Sets what VCPicture_lastFailure reports on this thread (the file loader's
// own failures happen before any decoding).
void VCPicture_setLastFailure(VCDecodeFailure failure);

// Encodes with TurboJPEG: a new "JPEG" image, or null (not logged). The
// caller has checked the image, its pixels and the quality (1…100).
VCImage* VCJpeg_encode(const VCImage* image, int quality);

// An encoder fed RGBA rows as they come (the stream writers of vc_stream.h).
class VCStreamEncoder {
public:
    virtual ~VCStreamEncoder() = default;
    // The next `rows` rows, `pitch` bytes apart; false on failure or past the
    // picture's last row.
    virtual bool writeRows(const unsigned char* rgba, size_t pitch, int rows) = 0;
    // After the last row: the malloc'ed stream, or null.
    virtual unsigned char* finish(size_t* length) = 0;
    // Before the first row: the stream goes to the sink as it is made, and
    // the encoder ends with end() (false on failure, the sink's too).
    void setSink(int (*sink)(void*, const unsigned char*, size_t), void* user) {
        mSink = sink;
        mSinkUser = user;
    }
    virtual bool end() = 0;

protected:
    // Hands bytes to the sink; false when it refuses.
    bool toSink(const unsigned char* bytes, size_t length) {
        return length == 0 || mSink(mSinkUser, bytes, length) == 0;
    }
    int (*mSink)(void*, const unsigned char*, size_t) = nullptr;
    void* mSinkUser = nullptr;
};

// The stream VCJpeg_encode makes of an "RGBA" image (quality 1...100), or of
// a straight-alpha PNG as VCPicture_encodePng makes it; null when the
// encoder cannot start.
std::unique_ptr<VCStreamEncoder> VCJpegEncoder_create(int width, int height, int quality);
std::unique_ptr<VCStreamEncoder> VCPngEncoder_create(int width, int height);

// Writes premultiplied RGBA pixels to a PNG file with straight alpha; false
// on any failure (not logged).
bool VCPng_writeFile(const char* path, const unsigned char* rgba, int width, int height);

#endif
