// The general JPEG codec: libjpeg-turbo (its TurboJPEG API to encode, its
// scanline interface to decode), used where the platform's fast codec is not
// installed.
#include <setjmp.h>
#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <turbojpeg.h>
// jpeglib.h needs stdio.h (FILE) before it.
#include <jpeglib.h>
// The message codes, to tell the kinds of failure apart.
#include <jerror.h>

#include <vector>

#include "vc_image_codec.h"
#include "vc_image_layout.h"

namespace {

// Decoding goes through libjpeg-turbo's scanline interface (the engine under
// TurboJPEG, with TurboJPEG's default settings), so that a picture can be
// decoded a band of rows at a time instead of whole.
//
// libjpeg reports errors by longjmp back to the setjmp of the calling
// function, so the functions that call into it keep no objects with
// destructors of their own.
class JpegReader : public VCPictureReader {
public:
    explicit JpegReader(const VCByteInput& input) : mInput(input) {
        mInfo.err = jpeg_std_error(&mError.base);
        mError.base.error_exit = onError;
        mError.base.emit_message = onMessage;
        mError.base.output_message = [](j_common_ptr) {};
        mProgress.progress_monitor = onProgress;
    }
    ~JpegReader() override {
        if (mCreated) jpeg_destroy_decompress(&mInfo);
    }

    bool readHeader(int* width, int* height) override {
        if (setjmp(mError.jump)) return false;
        jpeg_create_decompress(&mInfo);
        mCreated = true;
        mInfo.client_data = this;
        mInfo.progress = &mProgress;
        if (mInput.pulled()) {
            mPulled.resize(kPullBytes);
            mSource.init_source = [](j_decompress_ptr) {};
            mSource.fill_input_buffer = fill;
            mSource.skip_input_data = skip;
            mSource.resync_to_restart = jpeg_resync_to_restart;
            mSource.term_source = [](j_decompress_ptr) {};
            mSource.bytes_in_buffer = 0;
            mSource.next_input_byte = nullptr;
            mInfo.src = &mSource;
        } else {
            jpeg_mem_src(&mInfo, mInput.bytes, static_cast<unsigned long>(mInput.length));
        }
        jpeg_read_header(&mInfo, TRUE);
        if (mInfo.image_width < 1 || mInfo.image_height < 1) return fail(VC_DECODE_CORRUPT);
        if (mInfo.image_width > static_cast<JDIMENSION>(INT32_MAX / 4) ||
            mInfo.image_height > static_cast<JDIMENSION>(INT32_MAX))
            return fail(VC_DECODE_TOO_LARGE);
        *width = static_cast<int>(mInfo.image_width);
        *height = static_cast<int>(mInfo.image_height);
        mHeaderRead = true;
        return true;
    }

    bool readRgba(unsigned char* rgba) override {
        return mHeaderRead && readRgbaBands(rgba, static_cast<int>(mInfo.image_height),
                                            [](int, int) { return true; });
    }

    bool readRgbaBands(unsigned char* rgba, int rows,
                       const std::function<bool(int, int)>& band) override {
        if (!mHeaderRead || rows < 1 || !start()) return false;
        return VCPictureReader_forEachBand(static_cast<int>(mInfo.image_height), rows,
                                           [&](int first, int count) {
                                               return readRows(rgba, count) && band(first, count);
                                           }) &&
               finish();
    }

    bool decodesInPlace() const override { return true; }
    bool readRgbaBandsInPlace(int rows, size_t pitch,
                              const std::function<unsigned char*(int, int)>& place,
                              const std::function<bool(int, int)>& band) override {
        if (!mHeaderRead || rows < 1 || !start()) return false;
        mPitch = pitch;
        const bool ok = VCPictureReader_forEachBand(
                            static_cast<int>(mInfo.image_height), rows,
                            [&](int first, int count) {
                                unsigned char* at = place(first, count);
                                return at != nullptr && readRows(at, count) && band(first, count);
                            }) &&
                        finish();
        mPitch = 0;
        return ok;
    }

    VCDecodeFailure failure() const override { return mError.failure; }

    JpegReader(const JpegReader&) = delete;
    JpegReader& operator=(const JpegReader&) = delete;

private:
    static constexpr int kMaxRowsPerRead = 16;
    // Beyond this many scans a progressive picture is refused: each one costs
    // a pass over the whole image, and a few bytes of stream make one.
    static constexpr int kMaxScans = 500;

    struct ErrorManager {
        jpeg_error_mgr base;
        jmp_buf jump;
        VCDecodeFailure failure;
    };

    [[noreturn]] static void stop(j_common_ptr info, VCDecodeFailure failure) {
        ErrorManager* manager = reinterpret_cast<ErrorManager*>(info->err);
        manager->failure = failure;
        longjmp(manager->jump, 1);
    }
    [[noreturn]] static void onError(j_common_ptr info) {
        stop(info, failureOf(info->err->msg_code));
    }
    // A warning (a corrupt or truncated stream that would decode as grey)
    // stops the picture; trace messages (level > 0) are ignored.
    static void onMessage(j_common_ptr info, int level) {
        if (level < 0) onError(info);
    }
    static void onProgress(j_common_ptr info) {
        if (info->is_decompressor &&
            reinterpret_cast<j_decompress_ptr>(info)->input_scan_number > kMaxScans)
            stop(info, VC_DECODE_CORRUPT);
    }

    // What a libjpeg error or warning means to someone holding the file.
    static VCDecodeFailure failureOf(int code) {
        switch (code) {
            case JWRN_JPEG_EOF:
            case JERR_INPUT_EOF:
            case JERR_INPUT_EMPTY:
                return VC_DECODE_TRUNCATED;
            case JERR_CONVERSION_NOTIMPL:
            case JERR_BAD_J_COLORSPACE:
            case JERR_COMPONENT_COUNT:
                return VC_DECODE_UNSUPPORTED_COLOR;
            case JERR_BAD_PRECISION:
            case JERR_SOF_UNSUPPORTED:
            case JERR_ARITH_NOTIMPL:
            case JERR_NOT_COMPILED:
                return VC_DECODE_UNSUPPORTED_CODING;
            case JERR_IMAGE_TOO_BIG:
            case JERR_WIDTH_OVERFLOW:
                return VC_DECODE_TOO_LARGE;
            case JERR_OUT_OF_MEMORY:
                return VC_DECODE_NO_MEMORY;
            case JERR_FILE_READ:
                return VC_DECODE_READ_FAILED;
            default:
                return VC_DECODE_CORRUPT;
        }
    }

    bool fail(VCDecodeFailure failure) {
        mError.failure = failure;
        return false;
    }

    // Each call into libjpeg sits in a function of its own with its own
    // setjmp, so that nothing a longjmp skips is still in use.
    bool start() {
        if (setjmp(mError.jump)) return false;
        // libjpeg turns CMYK and YCCK into CMYK only; readRows makes RGBA of it.
        mCmyk = mInfo.jpeg_color_space == JCS_CMYK || mInfo.jpeg_color_space == JCS_YCCK;
        mInfo.out_color_space = mCmyk ? JCS_CMYK : JCS_EXT_RGBA;
        jpeg_start_decompress(&mInfo);
        if (mInfo.output_width != mInfo.image_width || mInfo.output_height != mInfo.image_height ||
            mInfo.output_components != 4)
            return fail(VC_DECODE_UNSUPPORTED_COLOR);
        return true;
    }

    // Adobe's CMYK JPEGs (the ones with its marker, which is nearly all of
    // them) store inverted inks: 255 is no ink. Either way a channel is the
    // product of its ink's and black's light.
    void cmykToRgba(unsigned char* row) const {
        const bool inverted = mInfo.saw_Adobe_marker != 0;
        for (JDIMENSION x = 0; x < mInfo.output_width; ++x, row += 4) {
            unsigned k = inverted ? row[3] : 255u - row[3];
            for (int c = 0; c < 3; ++c) {
                unsigned ink = inverted ? row[c] : 255u - row[c];
                row[c] = static_cast<unsigned char>((ink * k + 127) / 255);
            }
            row[3] = 255;
        }
    }

    // The next `count` rows, at the start of `rgba`.
    // Rows mPitch bytes apart, or packed when it is 0.
    bool readRows(unsigned char* rgba, int count) {
        const size_t stride = mPitch != 0 ? mPitch : static_cast<size_t>(mInfo.output_width) * 4;
        JSAMPROW pointers[kMaxRowsPerRead];
        if (setjmp(mError.jump)) return false;
        for (int done = 0; done < count;) {
            int want = count - done < kMaxRowsPerRead ? count - done : kMaxRowsPerRead;
            for (int i = 0; i < want; ++i) pointers[i] = rgba + (done + i) * stride;
            JDIMENSION got = jpeg_read_scanlines(&mInfo, pointers, static_cast<JDIMENSION>(want));
            if (got == 0) return fail(VC_DECODE_TRUNCATED);  // the source ran dry
            if (mCmyk)
                for (JDIMENSION i = 0; i < got; ++i) cmykToRgba(pointers[i]);
            done += static_cast<int>(got);
        }
        return true;
    }

    bool finish() {
        if (setjmp(mError.jump)) return false;
        jpeg_finish_decompress(&mInfo);
        return true;
    }

    // A pulled stream arrives through a buffer of this many bytes.
    static constexpr size_t kPullBytes = 64 << 10;
    static JpegReader* of(j_decompress_ptr info) {
        return static_cast<JpegReader*>(info->client_data);
    }
    // As libjpeg's own sources do at the end of the data: a warning (which
    // stops the picture as truncated) and an end marker to read.
    static boolean fill(j_decompress_ptr info) {
        JpegReader* self = of(info);
        const size_t got = self->mInput.pull(self->mPulled.data(), self->mPulled.size());
        // Bytes read before a failure are still decoded.
        if (got == 0 && self->mInput.failed) ERREXIT(info, JERR_FILE_READ);
        if (got == 0) {
            static const JOCTET kEnd[] = {0xFF, JPEG_EOI};
            WARNMS(info, JWRN_JPEG_EOF);
            self->mSource.next_input_byte = kEnd;
            self->mSource.bytes_in_buffer = sizeof(kEnd);
            return TRUE;
        }
        self->mSource.next_input_byte = self->mPulled.data();
        self->mSource.bytes_in_buffer = got;
        return TRUE;
    }
    static void skip(j_decompress_ptr info, long count) {
        jpeg_source_mgr* source = info->src;
        while (count > 0 && (size_t)count > source->bytes_in_buffer) {
            count -= (long)source->bytes_in_buffer;
            source->bytes_in_buffer = 0;
            fill(info);
        }
        if (count > 0) {
            source->next_input_byte += count;
            source->bytes_in_buffer -= (size_t)count;
        }
    }

    VCByteInput mInput;
    std::vector<JOCTET> mPulled;
    jpeg_source_mgr mSource{};
    jpeg_decompress_struct mInfo{};
    ErrorManager mError{};
    jpeg_progress_mgr mProgress{};
    bool mCreated = false;
    bool mHeaderRead = false;
    bool mCmyk = false;
    size_t mPitch = 0;
};

// RGBA rows into a 4:2:0 JPEG through libjpeg's scanline interface, with the
// settings TurboJPEG takes for an RGBA picture (tjCompress2), so the stream
// is the one VCJpeg_encode makes of the whole picture.
class JpegWriter : public VCStreamEncoder {
public:
    JpegWriter() {
        mDestination.init_destination = [](j_compress_ptr info) { self(info)->grow(); };
        mDestination.empty_output_buffer = [](j_compress_ptr info) -> boolean {
            JpegWriter* w = self(info);
            w->mLength = w->mCapacity;
            // With a sink the buffer is handed over whole and used again.
            if (w->mSink != nullptr) {
                if (!w->toSink(w->mStream, w->mLength)) ERREXIT(&w->mInfo, JERR_FILE_WRITE);
                w->mLength = 0;
                w->mDestination.next_output_byte = w->mStream;
                w->mDestination.free_in_buffer = w->mCapacity;
                return TRUE;
            }
            return w->grow() ? TRUE : FALSE;
        };
        mDestination.term_destination = [](j_compress_ptr info) {
            JpegWriter* w = self(info);
            w->mLength = w->mCapacity - w->mDestination.free_in_buffer;
            if (w->mSink != nullptr && !w->toSink(w->mStream, w->mLength))
                ERREXIT(&w->mInfo, JERR_FILE_WRITE);
        };
        mInfo.err = jpeg_std_error(&mError);
        mError.output_message = [](j_common_ptr) {};
        mError.error_exit = [](j_common_ptr info) {
            longjmp(reinterpret_cast<JpegWriter*>(info->client_data)->mJump, 1);
        };
        mInfo.client_data = this;
    }
    ~JpegWriter() override {
        if (mCreated) jpeg_destroy_compress(&mInfo);
        free(mStream);
    }

    bool begin(int width, int height, int quality) {
        if (setjmp(mJump)) return false;
        jpeg_create_compress(&mInfo);
        mCreated = true;
        mInfo.dest = &mDestination;
        mInfo.image_width = static_cast<JDIMENSION>(width);
        mInfo.image_height = static_cast<JDIMENSION>(height);
        mInfo.in_color_space = JCS_EXT_RGBA;
        mInfo.input_components = 4;
        jpeg_set_defaults(&mInfo);
        jpeg_set_quality(&mInfo, quality, TRUE);
        // TurboJPEG's choice: the accurate DCT from quality 96 up.
        mInfo.dct_method = quality >= 96 ? JDCT_ISLOW : JDCT_FASTEST;
        jpeg_set_colorspace(&mInfo, JCS_YCbCr);
        mInfo.comp_info[0].h_samp_factor = 2;
        mInfo.comp_info[0].v_samp_factor = 2;
        for (int c = 1; c < 3; ++c) {
            mInfo.comp_info[c].h_samp_factor = 1;
            mInfo.comp_info[c].v_samp_factor = 1;
        }
        jpeg_start_compress(&mInfo, TRUE);
        return mStarted = true;
    }

    bool writeRows(const unsigned char* rgba, size_t pitch, int rows) override {
        if (!mStarted || rows < 0 ||
            static_cast<JDIMENSION>(rows) > mInfo.image_height - mInfo.next_scanline)
            return false;
        JSAMPROW pointers[kRowsPerCall];
        if (setjmp(mJump)) return mStarted = false;
        for (int done = 0; done < rows;) {
            int n = rows - done < kRowsPerCall ? rows - done : kRowsPerCall;
            for (int i = 0; i < n; ++i)
                pointers[i] = const_cast<JSAMPROW>(rgba + static_cast<size_t>(done + i) * pitch);
            done += static_cast<int>(
                jpeg_write_scanlines(&mInfo, pointers, static_cast<JDIMENSION>(n)));
        }
        return true;
    }

    unsigned char* finish(size_t* length) override {
        if (!end()) return nullptr;
        unsigned char* stream = mStream;
        *length = mLength;
        mStream = nullptr;
        return stream;
    }

    JpegWriter(const JpegWriter&) = delete;
    JpegWriter& operator=(const JpegWriter&) = delete;

private:
    static constexpr int kRowsPerCall = 16;

    static JpegWriter* self(j_compress_ptr info) {
        return reinterpret_cast<JpegWriter*>(info->client_data);
    }

    // Room after the first mLength bytes: the buffer doubles (a failure to
    // grow stops the encoder through its error exit).
    bool grow() {
        size_t capacity = mCapacity == 0 ? 1 << 16 : mCapacity * 2;
        unsigned char* grown = static_cast<unsigned char*>(realloc(mStream, capacity));
        if (grown == nullptr) ERREXIT1(&mInfo, JERR_OUT_OF_MEMORY, 0);
        mStream = grown;
        mCapacity = capacity;
        mDestination.next_output_byte = mStream + mLength;
        mDestination.free_in_buffer = mCapacity - mLength;
        return true;
    }

public:
    bool end() override {
        if (!mStarted || mInfo.next_scanline != mInfo.image_height) return false;
        if (setjmp(mJump)) return false;
        jpeg_finish_compress(&mInfo);
        return mSink != nullptr || mLength > 0;
    }

private:
    jpeg_compress_struct mInfo{};
    jpeg_error_mgr mError{};
    jpeg_destination_mgr mDestination{};
    jmp_buf mJump;
    unsigned char* mStream = nullptr;
    size_t mLength = 0;
    size_t mCapacity = 0;
    bool mCreated = false;
    bool mStarted = false;
};

// TurboJPEG pixel format of an RGB-family or grey image, -1 otherwise.
int turboPixelFormat(uint32_t format) {
    switch (format) {
        case VC_FORMAT_RGBA:
            return TJPF_RGBA;
        case VC_FORMAT_BGRA:
            return TJPF_BGRA;
        case VC_FORMAT_ARGB:
            return TJPF_ARGB;
        case VC_FORMAT_ABGR:
            return TJPF_ABGR;
        case VC_FORMAT_RGB8:
            return TJPF_RGB;
        case VC_FORMAT_BGR8:
            return TJPF_BGR;
        case VC_FORMAT_GREY:
            return TJPF_GRAY;
        default:
            return -1;
    }
}

// The buffer must hold `needed` bytes; a size field of 0 means "as the geometry says".
bool holds(const VCImage* image, uint64_t needed) {
    return image->size == 0 || image->size >= needed;
}

// Where the stream goes: a malloc'ed buffer of the worst-case size that the
// record adopts as it is, or (when that cannot be had) one grown by TurboJPEG.
struct Output {
    unsigned char* jpeg = nullptr;
    unsigned long size = 0;
    int flags = VC_JPEG_ENCODE_FLAGS;
    bool ours = false;

    void reserve(int width, int height, int subsampling) {
        // tjBufSize computes in int: past 2^28 pixels TurboJPEG grows the buffer instead.
        if (static_cast<uint64_t>(width) * static_cast<uint64_t>(height) > (1u << 28)) return;
        unsigned long capacity = tjBufSize(width, height, subsampling);
        if (capacity == static_cast<unsigned long>(-1)) return;
        jpeg = static_cast<unsigned char*>(malloc(capacity));
        if (jpeg == nullptr) return;
        size = capacity;
        flags |= TJFLAG_NOREALLOC;
        ours = true;
    }
};

int encodePacked(tjhandle turbo, const VCImage* image, int pixelFormat, int quality, Output* out) {
    if (!holds(image, VCImage_requiredSize(image->width, image->height, image->format))) return -1;
    int subsampling = pixelFormat == TJPF_GRAY ? TJSAMP_GRAY : VC_JPEG_SUBSAMPLING;
    out->reserve(image->width, image->height, subsampling);
    // Pitch 0: rows tightly packed, as in every record.
    return tjCompress2(turbo, image->data, image->width, 0, image->height, pixelFormat, &out->jpeg,
                       &out->size, subsampling, quality, out->flags);
}

// 4:2:0 pictures go to the encoder as planes, without a trip through RGB;
// interleaved chroma is split into two planes first.
int encode420(tjhandle turbo, const VCImage* image, int quality, Output* out) {
    int w = image->width;
    int h = image->height;
    VCYuvLayout layout;
    if (w % 2 != 0 || h % 2 != 0 || !VCImage_yuvLayout(image, &layout)) return -1;
    size_t luma = static_cast<size_t>(w) * h;
    size_t quarter = luma / 4;
    size_t chromaStart = layout.uOffset < layout.vOffset ? layout.uOffset : layout.vOffset;
    if (chromaStart < luma || !holds(image, chromaStart + 2 * quarter)) return -1;
    const unsigned char* planes[3] = {image->data, image->data + layout.uOffset,
                                      image->data + layout.vOffset};
    std::vector<unsigned char> split;
    if (layout.chromaStep != 1) {
        split.resize(2 * quarter);
        const unsigned char* u = planes[1];
        const unsigned char* v = planes[2];
        for (size_t i = 0; i < quarter; ++i) {
            split[i] = u[2 * i];
            split[quarter + i] = v[2 * i];
        }
        planes[1] = split.data();
        planes[2] = split.data() + quarter;
    }
    out->reserve(w, h, TJSAMP_420);
    return tjCompressFromYUVPlanes(turbo, planes, w, nullptr, h, TJSAMP_420, &out->jpeg, &out->size,
                                   quality, out->flags);
}

// Packed 4:2:2 ("YUYV", "YVYU") is split into planes and encoded as 4:2:2.
int encode422(tjhandle turbo, const VCImage* image, int quality, Output* out) {
    int w = image->width;
    int h = image->height;
    VCYuvLayout layout;
    if (w % 2 != 0 || !VCImage_yuvLayout(image, &layout)) return -1;
    size_t luma = static_cast<size_t>(w) * h;
    if (!holds(image, 2 * luma)) return -1;
    std::vector<unsigned char> planar(2 * luma);
    unsigned char* y = planar.data();
    unsigned char* u = y + luma;
    unsigned char* v = u + luma / 2;
    const unsigned char* src = image->data;
    for (size_t i = 0; i < luma / 2; ++i, src += 4) {
        y[2 * i] = src[0];
        y[2 * i + 1] = src[2];
        u[i] = src[layout.uOffset];
        v[i] = src[layout.vOffset];
    }
    const unsigned char* planes[3] = {y, u, v};
    out->reserve(w, h, TJSAMP_422);
    return tjCompressFromYUVPlanes(turbo, planes, w, nullptr, h, TJSAMP_422, &out->jpeg, &out->size,
                                   quality, out->flags);
}

}  // namespace

std::unique_ptr<VCPictureReader> VCJpegReader_create(const VCByteInput& input) {
    return std::unique_ptr<VCPictureReader>(new JpegReader(input));
}

std::unique_ptr<VCStreamEncoder> VCJpegEncoder_create(int width, int height, int quality) {
    std::unique_ptr<JpegWriter> writer(new JpegWriter());
    if (width < 1 || height < 1 || !writer->begin(width, height, quality)) return nullptr;
    return std::unique_ptr<VCStreamEncoder>(writer.release());
}

VCImage* VCJpeg_encode(const VCImage* image, int quality) {
    // A picture whose size the record cannot state is not taken.
    if (VCImage_requiredSize(image->width, image->height, image->format) == 0) return nullptr;
    tjhandle turbo = tjInitCompress();
    if (turbo == nullptr) return nullptr;
    Output output;
    int rc = -1;
    int pixelFormat = turboPixelFormat(image->format);
    if (pixelFormat >= 0) {
        rc = encodePacked(turbo, image, pixelFormat, quality, &output);
    } else if (VCImage_isYUV420(image->format)) {
        rc = encode420(turbo, image, quality, &output);
    } else if (image->format == VC_FORMAT_YUYV || image->format == VC_FORMAT_YVYU) {
        rc = encode422(turbo, image, quality, &output);
    }
    tjDestroy(turbo);

    unsigned char* stream = nullptr;
    if (rc == 0 && output.jpeg != nullptr && output.size > 0 && output.size <= UINT32_MAX) {
        if (output.ours) {
            // Give back the unused tail of the worst-case buffer.
            stream = static_cast<unsigned char*>(realloc(output.jpeg, output.size));
            if (stream == nullptr) stream = output.jpeg;
            output.jpeg = nullptr;
        } else {
            // The record frees its buffer with free(); TurboJPEG's own buffers
            // go back through tjFree.
            stream = static_cast<unsigned char*>(malloc(output.size));
            if (stream != nullptr) memcpy(stream, output.jpeg, output.size);
        }
    }
    if (output.jpeg != nullptr) {
        if (output.ours)
            free(output.jpeg);
        else
            tjFree(output.jpeg);
    }
    if (stream == nullptr) return nullptr;
    VCImage* out = VCImage_createEmpty(image->width, image->height, VC_FORMAT_JPEG);
    out->data = stream;
    out->size = static_cast<uint32_t>(output.size);
    return out;
}
