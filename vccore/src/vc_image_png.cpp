// PNG through libpng: the general decoder for PNG data and the PNG file writer.
//
// libpng reports errors by longjmp back to the setjmp of the calling
// function, so the functions that call into it keep no objects with
// destructors of their own: everything they own lives in members or in a
// state record that is cleaned up once control is back.
#include <png.h>
#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include "vc_image_codec.h"

namespace {

// What a libpng error means to someone holding the file; libpng says it
// only in words.
VCDecodeFailure failureOf(const char* message) {
    if (message == nullptr) return VC_DECODE_CORRUPT;
    if (strcmp(message, "truncated") == 0) return VC_DECODE_TRUNCATED;
    if (strcmp(message, "read failed") == 0) return VC_DECODE_READ_FAILED;
    if (strstr(message, "exceeds user limit") != nullptr || strstr(message, "too large") != nullptr)
        return VC_DECODE_TOO_LARGE;
    if (strstr(message, "memory") != nullptr) return VC_DECODE_NO_MEMORY;
    return VC_DECODE_CORRUPT;
}

// Readers pass where their failure goes as the error pointer; the writer none.
// A size beyond libpng's limits is told by a warning just before the error.
[[noreturn]] void onPngError(png_structp png, png_const_charp message) {
    VCDecodeFailure* failure = static_cast<VCDecodeFailure*>(png_get_error_ptr(png));
    if (failure != nullptr && *failure == VC_DECODE_OK) *failure = failureOf(message);
    png_longjmp(png, 1);
}

// Warnings (bad ancillary chunks and the like) do not stop a picture.
void onPngWarning(png_structp png, png_const_charp message) {
    VCDecodeFailure* failure = static_cast<VCDecodeFailure*>(png_get_error_ptr(png));
    if (failure != nullptr && failureOf(message) == VC_DECODE_TOO_LARGE)
        *failure = VC_DECODE_TOO_LARGE;
}

struct Source {
    VCByteInput input;
    size_t position;  // in a whole buffer
};

void readFromSource(png_structp png, png_bytep out, png_size_t count) {
    Source* source = static_cast<Source*>(png_get_io_ptr(png));
    VCByteInput& input = source->input;
    if (input.pulled()) {
        const size_t got = input.pull(out, count);
        if (input.failed) png_error(png, "read failed");
        if (got < count) png_error(png, "truncated");
        return;
    }
    if (count > input.length - source->position) png_error(png, "truncated");
    const unsigned char* from = input.bytes + source->position;
    for (png_size_t i = 0; i < count; ++i) out[i] = from[i];
    source->position += count;
}

class PngReader : public VCPictureReader {
public:
    explicit PngReader(const VCByteInput& input) : mSource{input, 0} {
        mPng = png_create_read_struct(PNG_LIBPNG_VER_STRING, &mFailure, onPngError, onPngWarning);
        if (mPng != nullptr) mInfo = png_create_info_struct(mPng);
    }
    ~PngReader() override {
        if (mPng != nullptr)
            png_destroy_read_struct(&mPng, mInfo != nullptr ? &mInfo : nullptr, nullptr);
        free(mRows);
    }

    bool readHeader(int* width, int* height) override {
        if (mPng == nullptr || mInfo == nullptr) return fail(VC_DECODE_NO_MEMORY);
        if (setjmp(png_jmpbuf(mPng))) return false;
        png_set_read_fn(mPng, &mSource, readFromSource);
        png_read_info(mPng, mInfo);
        // Every colour type and depth is brought to 8-bit straight-alpha RGBA.
        int colorType = png_get_color_type(mPng, mInfo);
        int depth = png_get_bit_depth(mPng, mInfo);
        bool transparency = png_get_valid(mPng, mInfo, PNG_INFO_tRNS) != 0;
        if (colorType == PNG_COLOR_TYPE_PALETTE) png_set_palette_to_rgb(mPng);
        if (colorType == PNG_COLOR_TYPE_GRAY && depth < 8) png_set_expand_gray_1_2_4_to_8(mPng);
        if (transparency) png_set_tRNS_to_alpha(mPng);
        if (depth == 16) png_set_strip_16(mPng);
        if (colorType == PNG_COLOR_TYPE_GRAY || colorType == PNG_COLOR_TYPE_GRAY_ALPHA)
            png_set_gray_to_rgb(mPng);
        if ((colorType & PNG_COLOR_MASK_ALPHA) == 0 && !transparency)
            png_set_add_alpha(mPng, 0xFF, PNG_FILLER_AFTER);
        mPasses = png_set_interlace_handling(mPng);
        png_read_update_info(mPng, mInfo);
        mWidth = png_get_image_width(mPng, mInfo);
        mHeight = png_get_image_height(mPng, mInfo);
        // libpng keeps sizes below 2^31; the row size proves the transforms took.
        if (mWidth == 0 || mHeight == 0 ||
            png_get_rowbytes(mPng, mInfo) != static_cast<size_t>(mWidth) * 4)
            return fail(VC_DECODE_CORRUPT);
        *width = static_cast<int>(mWidth);
        *height = static_cast<int>(mHeight);
        return true;
    }

    bool readRgba(unsigned char* rgba) override {
        free(mRows);
        mRows = static_cast<png_bytep*>(malloc(sizeof(png_bytep) * mHeight));
        if (mRows == nullptr) return fail(VC_DECODE_NO_MEMORY);
        size_t stride = static_cast<size_t>(mWidth) * 4;
        for (png_uint_32 y = 0; y < mHeight; ++y) mRows[y] = rgba + y * stride;
        if (setjmp(png_jmpbuf(mPng))) return false;
        png_read_image(mPng, mRows);
        return true;
    }

    bool readRgbaBands(unsigned char* rgba, int rows,
                       const std::function<bool(int, int)>& band) override {
        if (mHeight == 0 || rows < 1) return false;
        const size_t stride = static_cast<size_t>(mWidth) * 4;
        const int height = static_cast<int>(mHeight);
        if (mPasses != 1) {
            // Interlaced rows are only complete after the last pass.
            unsigned char* whole = static_cast<unsigned char*>(malloc(stride * mHeight));
            if (whole == nullptr) return fail(VC_DECODE_NO_MEMORY);
            bool ok = readRgba(whole) &&
                      VCPictureReader_forEachBand(height, rows, [&](int first, int count) {
                          memcpy(rgba, whole + first * stride, count * stride);
                          return band(first, count);
                      });
            free(whole);
            return ok;
        }
        free(mRows);
        mRows = static_cast<png_bytep*>(malloc(sizeof(png_bytep) * rows));
        if (mRows == nullptr) return fail(VC_DECODE_NO_MEMORY);
        for (int i = 0; i < rows; ++i) mRows[i] = rgba + i * stride;
        return VCPictureReader_forEachBand(height, rows, [&](int first, int count) {
            return readRows(count) && band(first, count);
        });
    }

    VCDecodeFailure failure() const override { return mFailure; }

    PngReader(const PngReader&) = delete;
    PngReader& operator=(const PngReader&) = delete;

private:
    bool fail(VCDecodeFailure failure) {
        mFailure = failure;
        return false;
    }

    // The next `count` rows into mRows; a libpng error returns here.
    bool readRows(int count) {
        if (setjmp(png_jmpbuf(mPng))) return false;
        png_read_rows(mPng, mRows, nullptr, static_cast<png_uint_32>(count));
        return true;
    }

    Source mSource;
    png_structp mPng = nullptr;
    png_infop mInfo = nullptr;
    png_bytep* mRows = nullptr;
    png_uint_32 mWidth = 0;
    png_uint_32 mHeight = 0;
    int mPasses = 1;
    VCDecodeFailure mFailure = VC_DECODE_OK;
};

// Where a PNG stream goes: a FILE, or a growing malloc'ed buffer.
struct PngSink {
    // A file, a function, or (neither) a growing buffer.
    FILE* file = nullptr;
    int (*out)(void*, const unsigned char*, size_t) = nullptr;
    void* user = nullptr;
    unsigned char* bytes = nullptr;
    size_t length = 0;
    size_t capacity = 0;
};

void writeToSink(png_structp png, png_bytep data, png_size_t count) {
    PngSink* sink = static_cast<PngSink*>(png_get_io_ptr(png));
    if (sink->file != nullptr) {
        if (fwrite(data, 1, count, sink->file) != count) png_error(png, "write failed");
        return;
    }
    if (sink->out != nullptr) {
        if (sink->out(sink->user, data, count) != 0) png_error(png, "write failed");
        return;
    }
    if (count > sink->capacity - sink->length) {
        size_t capacity = sink->capacity < 4096 ? 4096 : sink->capacity;
        while (count > capacity - sink->length) {
            if (capacity > SIZE_MAX / 2) png_error(png, "too large");
            capacity *= 2;
        }
        unsigned char* grown = static_cast<unsigned char*>(realloc(sink->bytes, capacity));
        if (grown == nullptr) png_error(png, "out of memory");
        sink->bytes = grown;
        sink->capacity = capacity;
    }
    memcpy(sink->bytes + sink->length, data, count);
    sink->length += count;
}

void flushSink(png_structp png) {
    PngSink* sink = static_cast<PngSink*>(png_get_io_ptr(png));
    if (sink->file != nullptr && fflush(sink->file) != 0) png_error(png, "write failed");
}

// Straight alpha from premultiplied: c·255/a rounded, capped at 255; fully
// transparent pixels carry no colour.
void unpremultiplyRow(const unsigned char* from, unsigned char* to, png_uint_32 width) {
    for (png_uint_32 x = 0; x < width; ++x, from += 4, to += 4) {
        unsigned a = from[3];
        to[3] = static_cast<unsigned char>(a);
        if (a == 255) {
            to[0] = from[0];
            to[1] = from[1];
            to[2] = from[2];
            continue;
        }
        for (int c = 0; c < 3; ++c) {
            unsigned v = a == 0 ? 0 : (from[c] * 255u + a / 2) / a;
            to[c] = static_cast<unsigned char>(v > 255 ? 255 : v);
        }
    }
}

// A straight-alpha PNG written row by row into a sink; each call into libpng
// sits in a function of its own with its own setjmp.
class PngWriter : public VCStreamEncoder {
public:
    PngWriter(int width, int height, bool premultiplied)
        : mWidth(static_cast<png_uint_32>(width)),
          mHeight(static_cast<png_uint_32>(height)),
          mPremultiplied(premultiplied) {
        if (width < 1 || height < 1) return;
        mRow = static_cast<unsigned char*>(malloc(static_cast<size_t>(width) * 4));
        mPng = png_create_write_struct(PNG_LIBPNG_VER_STRING, nullptr, onPngError, onPngWarning);
        if (mPng != nullptr) mInfo = png_create_info_struct(mPng);
    }
    ~PngWriter() override {
        if (mPng != nullptr) png_destroy_write_struct(&mPng, mInfo != nullptr ? &mInfo : nullptr);
        free(mRow);
        free(mSink.bytes);
    }

    // Where the stream goes: `file`, or (null) a growing buffer.
    bool begin(FILE* file) {
        if (mRow == nullptr || mInfo == nullptr) return false;
        mSink.file = file;
        if (setjmp(png_jmpbuf(mPng))) return false;
        png_set_write_fn(mPng, &mSink, writeToSink, flushSink);
        png_set_IHDR(mPng, mInfo, mWidth, mHeight, 8, PNG_COLOR_TYPE_RGB_ALPHA, PNG_INTERLACE_NONE,
                     PNG_COMPRESSION_TYPE_DEFAULT, PNG_FILTER_TYPE_DEFAULT);
        png_write_info(mPng, mInfo);
        return mStarted = true;
    }

    bool writeRows(const unsigned char* rgba, size_t pitch, int rows) override {
        if (mSink.out == nullptr && VCStreamEncoder::mSink != nullptr) {
            // The header went out before there was a sink.
            if (!toSink(mSink.bytes, mSink.length)) return false;
            mSink.length = 0;
            mSink.out = VCStreamEncoder::mSink;
            mSink.user = mSinkUser;
        }
        if (!mStarted || rows < 0 || static_cast<png_uint_32>(rows) > mHeight - mWritten)
            return false;
        if (setjmp(png_jmpbuf(mPng))) return mStarted = false;
        for (int i = 0; i < rows; ++i) {
            const unsigned char* row = rgba + i * pitch;
            if (mPremultiplied) {
                unpremultiplyRow(row, mRow, mWidth);
                row = mRow;
            }
            png_write_row(mPng, row);
        }
        mWritten += static_cast<png_uint_32>(rows);
        return true;
    }

    bool end() override {
        if (!mStarted || mWritten != mHeight) return false;
        if (setjmp(png_jmpbuf(mPng))) return false;
        png_write_end(mPng, nullptr);
        return true;
    }

    unsigned char* finish(size_t* length) override {
        if (!end() || mSink.length == 0) return nullptr;
        unsigned char* bytes = mSink.bytes;
        *length = mSink.length;
        mSink.bytes = nullptr;
        return bytes;
    }

    PngWriter(const PngWriter&) = delete;
    PngWriter& operator=(const PngWriter&) = delete;

private:
    png_uint_32 mWidth;
    png_uint_32 mHeight;
    bool mPremultiplied;
    unsigned char* mRow = nullptr;
    png_structp mPng = nullptr;
    png_infop mInfo = nullptr;
    PngSink mSink;
    png_uint_32 mWritten = 0;
    bool mStarted = false;
};

}  // namespace

std::unique_ptr<VCPictureReader> VCPngReader_create(const VCByteInput& input) {
    return std::unique_ptr<VCPictureReader>(new PngReader(input));
}

std::unique_ptr<VCStreamEncoder> VCPngEncoder_create(int width, int height) {
    std::unique_ptr<PngWriter> writer(new PngWriter(width, height, false));
    if (!writer->begin(nullptr)) return nullptr;
    return std::unique_ptr<VCStreamEncoder>(writer.release());
}

bool VCPng_writeFile(const char* path, const unsigned char* rgba, int width, int height) {
    // No pixels: refused before the file is touched.
    if (path == nullptr || rgba == nullptr || width < 1 || height < 1) return false;
    FILE* file = fopen(path, "wb");
    if (file == nullptr) return false;
    bool ok;
    {
        PngWriter writer(width, height, true);
        ok = writer.begin(file) && writer.writeRows(rgba, static_cast<size_t>(width) * 4, height) &&
             writer.end();
    }
    if (ferror(file)) ok = false;
    if (fclose(file) != 0) ok = false;
    // A picture is whole or absent: a failed write leaves no broken file.
    if (!ok) remove(path);
    return ok;
}

extern "C" unsigned char* VCPicture_encodePng(const VCImage* image, size_t* length) {
    if (image == nullptr || length == nullptr || image->format != VC_FORMAT_RGBA ||
        image->data == nullptr)
        return nullptr;
    uint32_t required = VCImage_requiredSize(image->width, image->height, VC_FORMAT_RGBA);
    if (required == 0 || VCImage_size(image) < required) return nullptr;
    PngWriter writer(image->width, image->height, false);
    if (!writer.begin(nullptr) ||
        !writer.writeRows(image->data, static_cast<size_t>(image->width) * 4, image->height))
        return nullptr;
    return writer.finish(length);
}
