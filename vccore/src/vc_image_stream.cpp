// Band-by-band decoding and encoding over the general codecs.
#include <stdlib.h>
#include <string.h>

#include "vc_image_codec.h"
#include "vccore/vc_error.h"
#include "vccore/vc_stream.h"

struct VCStreamReader {
    std::unique_ptr<VCPictureReader> reader;
    int width = 0;
    int height = 0;
    VCDecodeFailure failure = VC_DECODE_OK;
};

struct VCStreamWriter {
    std::unique_ptr<VCStreamEncoder> encoder;
};

namespace {

// The reason of a reader that stopped on its own (a band's refusal is not one).
int readerFailed(VCStreamReader* stream, VCDecodeFailure why) {
    stream->failure = why;
    VCPicture_setLastFailure(why);
    return VC_ERROR_CODEC_FAILED;
}

int readerFailed(VCStreamReader* stream) {
    VCDecodeFailure why = stream->reader->failure();
    return readerFailed(stream, why == VC_DECODE_OK ? VC_DECODE_CORRUPT : why);
}

VCStreamWriter* wrap(std::unique_ptr<VCStreamEncoder> encoder) {
    if (encoder == nullptr) return nullptr;
    VCStreamWriter* writer = new VCStreamWriter();
    writer->encoder = std::move(encoder);
    return writer;
}

// A reader for the given input, or null (with the reason set) for no picture.
VCStreamReader* open(const VCByteInput& input) {
    VCPicture_setLastFailure(VC_DECODE_NOT_A_PICTURE);
    if (input.bytes == nullptr && input.source == nullptr) return nullptr;
    std::unique_ptr<VCPictureReader> reader = VCPictureReader_create(input);
    if (reader == nullptr) return nullptr;
    VCPicture_setLastFailure(VC_DECODE_OK);
    VCStreamReader* stream = new VCStreamReader();
    stream->reader = std::move(reader);
    return stream;
}

}  // namespace

extern "C" VCStreamReader* VCStreamReader_open(const unsigned char* bytes, size_t length) {
    VCByteInput input;
    input.bytes = bytes;
    input.length = length;
    return open(input);
}

extern "C" VCStreamReader* VCStreamReader_openSource(VCStreamSource source, void* user) {
    VCByteInput input;
    input.source = source;
    input.user = user;
    return open(input);
}

extern "C" int VCStreamReader_readHeader(VCStreamReader* stream, int* width, int* height) {
    if (stream == nullptr || width == nullptr || height == nullptr) return VC_ERROR_NULL_PARAM;
    if (!stream->reader->readHeader(&stream->width, &stream->height)) return readerFailed(stream);
    *width = stream->width;
    *height = stream->height;
    return 0;
}

extern "C" int VCStreamReader_readBands(VCStreamReader* stream, int rows, VCStreamBand band,
                                        void* user) {
    if (stream == nullptr || band == nullptr) return VC_ERROR_NULL_PARAM;
    if (stream->width < 1 || rows < 1) return VC_ERROR_INVALID_STATE;
    unsigned char* rgba =
        static_cast<unsigned char*>(malloc(static_cast<size_t>(stream->width) * 4 * rows));
    if (rgba == nullptr) return readerFailed(stream, VC_DECODE_NO_MEMORY);
    int refused = 0;
    bool ok = stream->reader->readRgbaBands(rgba, rows, [&](int first, int count) {
        refused = band(user, rgba, first, count);
        return refused == 0;
    });
    free(rgba);
    if (refused != 0) return refused;
    return ok ? 0 : readerFailed(stream);
}

extern "C" int VCStreamReader_readBandsInPlace(VCStreamReader* stream, int rows, size_t pitch,
                                               VCStreamPlace place, VCStreamBand band, void* user) {
    if (stream == nullptr || place == nullptr || band == nullptr) return VC_ERROR_NULL_PARAM;
    if (stream->width < 1 || rows < 1 || pitch < static_cast<size_t>(stream->width) * 4)
        return VC_ERROR_INVALID_STATE;
    const size_t rowBytes = static_cast<size_t>(stream->width) * 4;
    unsigned char* placed = nullptr;
    int refused = 0;
    auto where = [&](int first, int count) {
        placed = place(user, first, count);
        return placed;
    };
    bool ok;
    if (stream->reader->decodesInPlace()) {
        ok = stream->reader->readRgbaBandsInPlace(rows, pitch, where, [&](int first, int count) {
            refused = band(user, placed, first, count);
            return refused == 0;
        });
    } else {
        unsigned char* rgba = static_cast<unsigned char*>(malloc(rowBytes * rows));
        if (rgba == nullptr) return readerFailed(stream, VC_DECODE_NO_MEMORY);
        ok = stream->reader->readRgbaBands(rgba, rows, [&](int first, int count) {
            if (where(first, count) == nullptr) return false;
            for (int i = 0; i < count; ++i)
                memcpy(placed + i * pitch, rgba + i * rowBytes, rowBytes);
            refused = band(user, placed, first, count);
            return refused == 0;
        });
        free(rgba);
    }
    if (refused != 0) return refused;
    if (!ok && placed == nullptr && stream->reader->failure() == VC_DECODE_OK)
        return VC_ERROR_INVALID_STATE;
    return ok ? 0 : readerFailed(stream);
}

extern "C" VCDecodeFailure VCStreamReader_failure(const VCStreamReader* stream) {
    return stream != nullptr ? stream->failure : VC_DECODE_NOT_A_PICTURE;
}

extern "C" void VCStreamReader_close(VCStreamReader* stream) {
    delete stream;
}

extern "C" VCStreamWriter* VCStreamWriter_openJpeg(int width, int height, int quality) {
    if (VCImage_requiredSize(width, height, VC_FORMAT_RGBA) == 0) return nullptr;
    if (quality < 1 || quality > 100) quality = 85;
    return wrap(VCJpegEncoder_create(width, height, quality));
}

extern "C" VCStreamWriter* VCStreamWriter_openPng(int width, int height) {
    if (VCImage_requiredSize(width, height, VC_FORMAT_RGBA) == 0) return nullptr;
    return wrap(VCPngEncoder_create(width, height));
}

extern "C" int VCStreamWriter_writeRows(VCStreamWriter* writer, const unsigned char* rgba,
                                        size_t pitch, int rows) {
    if (writer == nullptr || rgba == nullptr) return VC_ERROR_NULL_PARAM;
    return writer->encoder->writeRows(rgba, pitch, rows) ? 0 : VC_ERROR_CODEC_FAILED;
}

extern "C" unsigned char* VCStreamWriter_finish(VCStreamWriter* writer, size_t* length) {
    unsigned char* stream =
        writer != nullptr && length != nullptr ? writer->encoder->finish(length) : nullptr;
    delete writer;
    return stream;
}

extern "C" void VCStreamWriter_setSink(VCStreamWriter* writer, VCStreamSink sink, void* user) {
    if (writer != nullptr) writer->encoder->setSink(sink, user);
}

extern "C" int VCStreamWriter_end(VCStreamWriter* writer) {
    bool ok = writer != nullptr && writer->encoder->end();
    delete writer;
    return ok ? 0 : VC_ERROR_CODEC_FAILED;
}

extern "C" void VCStreamWriter_close(VCStreamWriter* writer) {
    delete writer;
}
