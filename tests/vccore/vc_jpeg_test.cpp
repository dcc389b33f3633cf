// JPEG and PNG coding of image records through the general codecs
// (TurboJPEG, libpng), with the platform's fast codec absent.
#include <gtest/gtest.h>
#include <string.h>
#include <turbojpeg.h>

#include <cmath>
#include <set>
#include <thread>

#include "jpeg_standin/jpeg_test_util.h"
#include "support/log_capture.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_file.h"
#include "vccore/vc_log.h"
#include "vccore/vc_picture.h"

using namespace jpegtest;

namespace {

#define REQUIRE_GENERAL_CODECS() \
    if (fastCodecInstalled()) GTEST_SKIP() << "the fast codec is installed here"

// First entry of the luminance quantisation table: 16 scaled by libjpeg's quality curve.
int lumaDcQuantizer(const Bytes& jpeg) {
    for (size_t i = 2; i + 5 < jpeg.size(); ++i) {
        if (jpeg[i] != 0xFF || jpeg[i + 1] != 0xDB) continue;
        if ((jpeg[i + 4] & 0x0F) == 0) return jpeg[i + 5];
    }
    return -1;
}

// libjpeg's scaling of the base value 16 for a quality, baseline-limited.
int expectedDc(int quality) {
    int scale = quality < 50 ? 5000 / quality : 200 - 2 * quality;
    int q = (16 * scale + 50) / 100;
    return q < 1 ? 1 : (q > 255 ? 255 : q);
}

Bytes turboDecode(const Bytes& jpeg, int pixelFormat, int* w, int* h, int* subsampling) {
    tjhandle tj = tjInitDecompress();
    int colorspace = 0;
    Bytes out;
    if (tjDecompressHeader3(tj, jpeg.data(), jpeg.size(), w, h, subsampling, &colorspace) == 0) {
        out.resize(static_cast<size_t>(*w) * *h * tjPixelSize[pixelFormat]);
        if (tjDecompress2(tj, jpeg.data(), jpeg.size(), out.data(), *w, 0, *h, pixelFormat, 0) != 0)
            out.clear();
    }
    tjDestroy(tj);
    return out;
}

Bytes encodeBytes(const VCImage* image, int quality) {
    VCImage* jpeg = VCImage_encodeToJpeg(image, quality);
    Bytes out;
    if (jpeg != nullptr) out = bytesOf(jpeg);
    VCImage_destroy(jpeg);
    return out;
}

double meanAbsDiff(const unsigned char* a, const unsigned char* b, size_t n) {
    double sum = 0;
    for (size_t i = 0; i < n; ++i) sum += std::abs(a[i] - b[i]);
    return sum / n;
}

// `source` converted by the image core (whose arithmetic has its own suite)
// into `format`, optionally with the chroma plane displaced to `chromaAt`.
Bytes convertTo(const VCImage* source, uint32_t format, uint32_t chromaAt = 0) {
    const size_t need = VCImage_requiredSize(source->width, source->height, format);
    const size_t luma = static_cast<size_t>(source->width) * source->height;
    Bytes out(chromaAt != 0 ? chromaAt + need - luma : need, 0xEE);
    VCImage* target = VCImage_createWrap(out.data(), source->width, source->height, format,
                                         static_cast<int>(out.size()), chromaAt);
    EXPECT_EQ(VC_OK, VCImage_convert(source, target));
    VCImage_destroy(target);
    return out;
}

Bytes convertBytes(Bytes& pixels, int w, int h, uint32_t from, uint32_t to) {
    VCImage* image = VCImage_createWrap(pixels.data(), w, h, from, 0, 0);
    Bytes out = convertTo(image, to);
    VCImage_destroy(image);
    return out;
}

VCImage* decodeInto(uint32_t format, const Bytes& data, int* rc) {
    VCImage* image = VCImage_createEmpty(0, 0, format);
    *rc = VCImage_decodeFromJpeg(image, data.data(), static_cast<int>(data.size()));
    return image;
}

}  // namespace

TEST(VcJpeg, EncodeMakesJpegRecordWithClampedQuality) {
    REQUIRE_GENERAL_CODECS();
    VCImage* image = makeRgba(64, 48);
    VCImage* jpeg = VCImage_encodeToJpeg(image, 90);
    ASSERT_NE(jpeg, nullptr);
    EXPECT_EQ(jpeg->format, 0x4745504Au);
    EXPECT_EQ(shapeOf(jpeg), "64x48");
    EXPECT_EQ(jpeg->wrapped, 0);
    EXPECT_EQ(jpeg->uvOffset, 0u);
    ASSERT_GT(jpeg->size, 100u);
    EXPECT_EQ(jpeg->data[0], 0xFF);
    EXPECT_EQ(jpeg->data[1], 0xD8);
    EXPECT_EQ(jpeg->data[jpeg->size - 2], 0xFF);
    EXPECT_EQ(jpeg->data[jpeg->size - 1], 0xD9);
    int w = 0, h = 0, subsampling = -1;
    turboDecode(bytesOf(jpeg), TJPF_RGBA, &w, &h, &subsampling);
    EXPECT_EQ(w, 64);
    EXPECT_EQ(h, 48);
    EXPECT_EQ(subsampling, TJSAMP_420);
    VCImage_destroy(jpeg);

    for (int quality : {1, 50, 85, 100})
        EXPECT_EQ(lumaDcQuantizer(encodeBytes(image, quality)), expectedDc(quality)) << quality;
    // Out-of-range qualities are 85, not clamped to the nearest end.
    Bytes q85 = encodeBytes(image, 85);
    for (int quality : {0, 101, -7}) EXPECT_EQ(encodeBytes(image, quality), q85) << quality;
    VCImage_destroy(image);
}

TEST(VcJpeg, DecodeIntoEachFormat) {
    REQUIRE_GENERAL_CODECS();
    VCImage* source = makeRgba(64, 48);
    Bytes jpeg = encodeBytes(source, 95);
    ASSERT_FALSE(jpeg.empty());
    int w, h, s, rc = 1;
    Bytes ref = turboDecode(jpeg, TJPF_RGBA, &w, &h, &s);
    const size_t n = 64 * 48;

    VCImage* rgba = decodeInto(VC_FORMAT_RGBA, jpeg, &rc);
    ASSERT_EQ(rc, 0);
    EXPECT_EQ(shapeOf(rgba), "64x48");
    EXPECT_EQ(rgba->wrapped, 0);
    ASSERT_EQ(VCImage_size(rgba), n * 4);
    EXPECT_EQ(0, memcmp(rgba->data, ref.data(), ref.size()));
    for (size_t i = 0; i < n; ++i) ASSERT_EQ(rgba->data[i * 4 + 3], 255) << i;
    double diff = 0;
    for (size_t i = 0; i < n * 4; ++i) diff += std::abs(rgba->data[i] - source->data[i]);
    EXPECT_LT(diff / (n * 3), 4.0);  // alpha adds nothing

    VCImage* bgr = decodeInto(VC_FORMAT_BGR8, jpeg, &rc);
    ASSERT_EQ(rc, 0);
    ASSERT_EQ(VCImage_size(bgr), n * 3);
    for (size_t i = 0; i < n * 3; ++i) ASSERT_EQ(bgr->data[i], ref[i / 3 * 4 + 2 - i % 3]) << i;

    VCImage* nv21 = decodeInto(VC_FORMAT_NV21, jpeg, &rc);
    ASSERT_EQ(rc, 0);
    EXPECT_EQ(shapeOf(nv21), "64x48");
    ASSERT_EQ(VCImage_size(nv21), n * 3 / 2);
    EXPECT_EQ(bytesOf(nv21), convertBytes(ref, 64, 48, VC_FORMAT_RGBA, VC_FORMAT_NV21));

    for (VCImage* i : {source, rgba, bgr, nv21}) VCImage_destroy(i);
}

// NV21 and NV12 are decoded a band of rows at a time; the result must be the
// whole picture decoded to RGBA (by TurboJPEG) and then converted, byte for
// byte, whatever the stream's sampling, scan structure and size.
TEST(VcJpeg, BandedDecodeEqualsWholeDecodeAndConversion) {
    REQUIRE_GENERAL_CODECS();
    struct Case {
        int w, h, subsampling, flags;
    } cases[] = {{64, 48, TJSAMP_420, 0},  {250, 38, TJSAMP_420, 0},  // bands of 16, 16 and 6 rows
                 {96, 34, TJSAMP_422, 0},  {48, 18, TJSAMP_444, TJFLAG_PROGRESSIVE},
                 {40, 20, TJSAMP_GRAY, 0}, {2, 2, TJSAMP_420, 0}};
    for (const Case& c : cases) {
        // A handle per picture: TurboJPEG keeps the progressive setting on one.
        tjhandle tj = tjInitCompress();
        VCImage* source = makeRgba(c.w, c.h);
        unsigned char* stream = nullptr;
        unsigned long length = 0;
        ASSERT_EQ(tjCompress2(tj, source->data, c.w, 0, c.h, TJPF_RGBA, &stream, &length,
                              c.subsampling, 90, c.flags),
                  0);
        Bytes jpeg(stream, stream + length);
        tjFree(stream);
        tjDestroy(tj);
        int w, h, s, rc = 1;
        Bytes whole = turboDecode(jpeg, TJPF_RGBA, &w, &h, &s);
        ASSERT_FALSE(whole.empty()) << c.w << "x" << c.h;
        for (uint32_t format : {VC_FORMAT_NV21, VC_FORMAT_NV12}) {
            VCImage* decoded = decodeInto(format, jpeg, &rc);
            ASSERT_EQ(rc, 0) << c.w << "x" << c.h;
            EXPECT_EQ(bytesOf(decoded), convertBytes(whole, c.w, c.h, VC_FORMAT_RGBA, format))
                << c.w << "x" << c.h << " sampling " << c.subsampling;
            VCImage_destroy(decoded);
        }
        // Into a caller's buffer whose chroma plane is kept apart (a padded
        // camera buffer): each band's chroma rows land there.
        const size_t luma = static_cast<size_t>(c.w) * c.h, chromaAt = luma + 64;
        Bytes caller(chromaAt + luma / 2, 0xEE);
        VCImage* padded = VCImage_createWrap(caller.data(), c.w, c.h, VC_FORMAT_NV21, 0,
                                             static_cast<uint32_t>(chromaAt));
        ASSERT_EQ(VCImage_decodeFromJpeg(padded, jpeg.data(), static_cast<int>(jpeg.size())), 0);
        VCImage* wholeImage = VCImage_createWrap(whole.data(), c.w, c.h, VC_FORMAT_RGBA, 0, 0);
        EXPECT_EQ(caller, convertTo(wholeImage, VC_FORMAT_NV21, static_cast<uint32_t>(chromaAt)))
            << c.w << "x" << c.h;
        for (VCImage* i : {source, padded, wholeImage}) VCImage_destroy(i);
    }

    // PNG too, interlaced (whole first) or not (row by row).
    for (bool interlaced : {false, true}) {
        PngPicture picture;
        picture.width = 36;
        picture.height = 22;
        picture.interlaced = interlaced;
        for (int i = 0; i < 36 * 22 * 4; ++i)
            picture.samples.push_back(static_cast<unsigned char>(i % 4 == 3 ? 255 : i * 37 % 251));
        int rc = 1;
        VCImage* decoded = decodeInto(VC_FORMAT_NV21, makePng(picture), &rc);
        ASSERT_EQ(rc, 0) << interlaced;
        EXPECT_EQ(bytesOf(decoded),
                  convertBytes(picture.samples, 36, 22, VC_FORMAT_RGBA, VC_FORMAT_NV21))
            << interlaced;
        VCImage_destroy(decoded);
    }
}

TEST(VcJpeg, DecodeIntoExistingBuffers) {
    REQUIRE_GENERAL_CODECS();
    VCImage* source = makeRgba(64, 48);
    Bytes jpeg = encodeBytes(source, 92);
    int w, h, s;
    Bytes reference = turboDecode(jpeg, TJPF_RGBA, &w, &h, &s);
    const int length = static_cast<int>(jpeg.size());

    // An owned buffer of the right size is decoded into in place.
    VCImage* owned = VCImage_createNew(64, 48, VC_FORMAT_RGBA);
    unsigned char* before = owned->data;
    ASSERT_EQ(VCImage_decodeFromJpeg(owned, jpeg.data(), length), 0);
    EXPECT_EQ(owned->data, before);
    EXPECT_EQ(0, memcmp(owned->data, reference.data(), reference.size()));

    // A wrapped buffer stays the caller's; its size field is its capacity.
    Bytes caller(64 * 48 * 4, 0);
    VCImage* wrapped =
        VCImage_createWrap(caller.data(), 1, 1, VC_FORMAT_RGBA, static_cast<int>(caller.size()), 0);
    ASSERT_EQ(VCImage_decodeFromJpeg(wrapped, jpeg.data(), length), 0);
    EXPECT_EQ(wrapped->data, caller.data());
    EXPECT_EQ(wrapped->wrapped, 1);
    EXPECT_EQ(wrapped->width, 64);
    EXPECT_EQ(caller, reference);

    // Too small by its size field, or by the geometry it was made for: refused
    // before anything changes, as decoding into it would run past its end.
    LogCapture log;
    Bytes small(400, 0x5A);
    VCImage* tooSmall = VCImage_createWrap(small.data(), 10, 10, VC_FORMAT_RGBA, 400, 0);
    VCImage* sizeless = VCImage_createWrap(small.data(), 10, 10, VC_FORMAT_RGBA, 0, 0);
    for (VCImage* image : {tooSmall, sizeless}) {
        EXPECT_EQ(VCImage_decodeFromJpeg(image, jpeg.data(), length), VC_ERROR_INVALID_SIZE);
        EXPECT_EQ(shapeOf(image), "10x10");
        EXPECT_EQ(small, Bytes(400, 0x5A));
    }
    EXPECT_EQ(countErrors(log, "VC_ERROR_INVALID_SIZE", -4), 2);
    for (VCImage* i : {owned, wrapped, tooSmall, sizeless, source}) VCImage_destroy(i);
}

TEST(VcJpeg, EncodesYuvPictures) {
    REQUIRE_GENERAL_CODECS();
    const int w = 64, h = 48;
    const size_t luma = static_cast<size_t>(w) * h;
    VCImage* source = makeRgba(w, h);
    Bytes nv21 = convertTo(source, VC_FORMAT_NV21);
    Bytes rgb = convertBytes(nv21, w, h, VC_FORMAT_NV21, VC_FORMAT_RGB8);  // what it stands for
    VCImage* image = VCImage_createWrap(nv21.data(), w, h, VC_FORMAT_NV21, 0, 0);
    Bytes fromNv21 = encodeBytes(image, 95);
    VCImage_destroy(image);
    ASSERT_FALSE(fromNv21.empty());
    int dw, dh, sub;
    Bytes decoded = turboDecode(fromNv21, TJPF_RGB, &dw, &dh, &sub);
    ASSERT_EQ(dw, w);
    EXPECT_EQ(sub, TJSAMP_420);
    EXPECT_LT(meanAbsDiff(decoded.data(), rgb.data(), luma * 3), 3.0);

    // The same samples in any 4:2:0 layout, or behind a displaced chroma
    // plane, make the very same stream.
    for (uint32_t format : {VC_FORMAT_NV12, VC_FORMAT_YV12, VC_FORMAT_YUVP, VC_FORMAT_NV21}) {
        const uint32_t chromaAt = format == VC_FORMAT_NV21 ? luma + 256 : 0;
        Bytes laid = convertTo(source, format, chromaAt);
        VCImage* other =
            VCImage_createWrap(laid.data(), w, h, format, static_cast<int>(laid.size()), chromaAt);
        EXPECT_EQ(encodeBytes(other, 95), fromNv21) << std::string((const char*)&format, 4);
        VCImage_destroy(other);
    }

    // Packed 4:2:2 keeps its horizontal subsampling.
    for (uint32_t format : {VC_FORMAT_YUYV, VC_FORMAT_YVYU}) {
        Bytes packed = convertTo(source, format);
        Bytes packedRgb = convertBytes(packed, w, h, format, VC_FORMAT_RGB8);
        VCImage* yuyv = VCImage_createWrap(packed.data(), w, h, format, 0, 0);
        Bytes back = turboDecode(encodeBytes(yuyv, 95), TJPF_RGB, &dw, &dh, &sub);
        VCImage_destroy(yuyv);
        ASSERT_EQ(back.size(), packedRgb.size());
        EXPECT_EQ(sub, TJSAMP_422);
        EXPECT_LT(meanAbsDiff(back.data(), packedRgb.data(), luma * 3), 3.0);
    }

    // Grey pictures make one-component streams.
    Bytes greyPixels = convertTo(source, VC_FORMAT_GREY);
    VCImage* grey = VCImage_createWrap(greyPixels.data(), w, h, VC_FORMAT_GREY, 0, 0);
    Bytes greyBack = turboDecode(encodeBytes(grey, 95), TJPF_GRAY, &dw, &dh, &sub);
    VCImage_destroy(grey);
    EXPECT_EQ(sub, TJSAMP_GRAY);
    ASSERT_EQ(greyBack.size(), luma);
    EXPECT_LT(meanAbsDiff(greyBack.data(), greyPixels.data(), luma), 2.0);
    VCImage_destroy(source);

    // 4:2:0 needs even sizes.
    LogCapture log;
    Bytes oddBuffer(63 * 48 * 3 / 2 + 1, 0);
    VCImage* odd = VCImage_createWrap(oddBuffer.data(), 63, 48, VC_FORMAT_NV21, 0, 0);
    EXPECT_EQ(VCImage_encodeToJpeg(odd, 90), nullptr);
    EXPECT_TRUE(log.contains(VF_LOG_ERROR, "Encoding failed (63x48 NV21)"));
    VCImage_destroy(odd);
}

TEST(VcJpeg, EncodeRefusals) {
    REQUIRE_GENERAL_CODECS();
    LogCapture log;
    EXPECT_EQ(VCImage_encodeToJpeg(nullptr, 90), nullptr);
    VCImage* empty = VCImage_createEmpty(64, 48, VC_FORMAT_RGBA);
    EXPECT_EQ(VCImage_encodeToJpeg(empty, 90), nullptr);
    EXPECT_TRUE(log.lines().empty()) << "null pictures are refused silently";
    VCImage_destroy(empty);

    Bytes pixels(64 * 48 * 4, 128);
    struct Case {
        int w, h;
        uint32_t format;
        int size;
        const char* line;
    } cases[] = {
        {0, 48, VC_FORMAT_RGBA, 0, "Encoding failed (0x48 RGBA)"},
        {64, 0, VC_FORMAT_RGBA, 0, "Encoding failed (64x0 RGBA)"},
        {64, 48, 0, 0, "Encoding failed (64x48     )"},  // "%4.4s" pads to four
        {64, 48, VC_FOURCC('A', 'B', 'C', 'D'), 0, "Encoding failed (64x48 ABCD)"},
        {64, 48, VC_FORMAT_JPEG, 0, "Encoding failed (64x48 JPEG)"},
        {64, 48, VC_FORMAT_RGBA, 100, "Encoding failed (64x48 RGBA)"},
        {64, 48, VC_FORMAT_RGB8, 64 * 48 * 3 - 1, "Encoding failed (64x48 RGB8)"},
    };
    for (const Case& c : cases) {
        log.clear();
        VCImage* image = VCImage_createWrap(pixels.data(), c.w, c.h, c.format, c.size, 0);
        EXPECT_EQ(VCImage_encodeToJpeg(image, 90), nullptr) << c.line;
        ASSERT_EQ(log.lines().size(), 1u) << c.line;
        EXPECT_EQ(log.lines()[0].level, VF_LOG_ERROR);
        EXPECT_EQ(log.lines()[0].text, c.line);
        VCImage_destroy(image);
    }
}

namespace {

// Every field of a record, to see that a failed decoding left it as it was.
std::string recordOf(const VCImage* image) {
    char text[160];
    snprintf(text, sizeof(text), "data %p %dx%d %4.4s wrapped %d size %u uv %u",
             static_cast<const void*>(image->data), image->width, image->height,
             reinterpret_cast<const char*>(&image->format), image->wrapped, image->size,
             image->uvOffset);
    return text;
}

}  // namespace

TEST(VcJpeg, DecodeFailuresSayWhyAndLeaveTheRecordAsFound) {
    REQUIRE_GENERAL_CODECS();
    VCImage* source = makeRgba(32, 32);
    Bytes jpeg = encodeBytes(source, 90);
    VCImage_destroy(source);
    VCImage* oddSource = makeRgba(3, 3);
    Bytes odd = encodeBytes(oddSource, 90);
    VCImage_destroy(oddSource);
    ASSERT_FALSE(jpeg.empty());
    LogCapture log;

    VCImage* image = VCImage_createEmpty(5, 5, VC_FORMAT_RGBA);
    EXPECT_EQ(VCImage_decodeFromJpeg(nullptr, jpeg.data(), 10), VC_ERROR_NULL_PARAM);
    EXPECT_EQ(VCImage_decodeFromJpeg(image, nullptr, 10), VC_ERROR_NULL_PARAM);
    EXPECT_EQ(VCImage_decodeFromJpeg(image, jpeg.data(), 0), VC_ERROR_NULL_PARAM);
    EXPECT_EQ(countErrors(log, "VC_ERROR_NULL_PARAM", -2), 3);
    EXPECT_EQ(VCImage_decodeFromJpeg(image, jpeg.data(), -3), VC_ERROR_INVALID_PARAM);
    EXPECT_EQ(VCPicture_lastFailure(), VC_DECODE_NOT_A_PICTURE);
    VCImage_destroy(image);

    Bytes badTable = jpeg;
    size_t dqt = findMarker(badTable, 0xDB);
    ASSERT_NE(dqt, 0u);
    badTable[dqt + 2] = 0x07;  // table index out of range
    Bytes twelveBit = jpeg;
    twelveBit[findMarker(jpeg, 0xC0) + 2] = 12;
    Bytes lossless = jpeg;
    lossless[findMarker(jpeg, 0xC0) - 1] = 0xC3;
    // Two channels of no known colour space.
    Bytes twoChannels = makeJpeg(8, 8, JCS_UNKNOWN, 2, JCS_UNKNOWN, Bytes(8 * 8 * 2, 99));

    PngPicture picture;
    picture.width = picture.height = 16;
    picture.samples.assign(16 * 16 * 4, 0x80);
    Bytes png = makePng(picture);
    Bytes pngBadCrc = png;
    pngBadCrc[29] ^= 0x55;  // inside the header chunk's checksum

    const char garbage[] = "hello, this is not a picture";
    const uint32_t kUnknown = VC_FOURCC('X', 'X', 'X', 'X');
    struct Case {
        const char* what;
        Bytes data;
        uint32_t format;
        int side;     // the record's preset square geometry
        bool buffer;  // whether the record owns a buffer of that geometry
        int status;
        VCDecodeFailure why;
    } cases[] = {
        {"garbage", Bytes(garbage, garbage + sizeof(garbage)), VC_FORMAT_RGBA, 5, false,
         VC_ERROR_CODEC_FAILED, VC_DECODE_NOT_A_PICTURE},
        {"truncated JPEG", Bytes(jpeg.begin(), jpeg.begin() + jpeg.size() / 2), VC_FORMAT_RGBA, 5,
         false, VC_ERROR_CODEC_FAILED, VC_DECODE_TRUNCATED},
        {"truncated JPEG into NV21", Bytes(jpeg.begin(), jpeg.begin() + jpeg.size() / 2),
         VC_FORMAT_NV21, 40, true, VC_ERROR_CODEC_FAILED, VC_DECODE_TRUNCATED},
        {"marker only",
         {0xFF, 0xD8},
         VC_FORMAT_RGBA,
         5,
         false,
         VC_ERROR_CODEC_FAILED,
         VC_DECODE_TRUNCATED},
        {"bad quantisation table", badTable, VC_FORMAT_RGBA, 5, false, VC_ERROR_CODEC_FAILED,
         VC_DECODE_CORRUPT},
        {"12-bit JPEG", twelveBit, VC_FORMAT_RGBA, 5, false, VC_ERROR_CODEC_FAILED,
         VC_DECODE_UNSUPPORTED_CODING},
        {"lossless JPEG", lossless, VC_FORMAT_RGBA, 5, false, VC_ERROR_CODEC_FAILED,
         VC_DECODE_UNSUPPORTED_CODING},
        {"two-channel JPEG", twoChannels, VC_FORMAT_RGBA, 5, false, VC_ERROR_CODEC_FAILED,
         VC_DECODE_UNSUPPORTED_COLOR},
        {"JPEG of 65000x65000", jpegDeclaring(jpeg, 65000, 65000), VC_FORMAT_RGBA, 5, false,
         VC_ERROR_CODEC_FAILED, VC_DECODE_TOO_LARGE},
        // 3.6 GB of RGBA fits the record's byte count but not its buffers.
        {"JPEG of 30000x30000", jpegDeclaring(jpeg, 30000, 30000), VC_FORMAT_RGBA, 0, false,
         VC_ERROR_INVALID_SIZE, VC_DECODE_TOO_LARGE},
        {"JPEG of 30000x30000 into BGR8", jpegDeclaring(jpeg, 30000, 30000), VC_FORMAT_BGR8, 0,
         false, VC_ERROR_INVALID_SIZE, VC_DECODE_TOO_LARGE},
        {"into a buffer too small", jpeg, VC_FORMAT_RGBA, 10, true, VC_ERROR_INVALID_SIZE,
         VC_DECODE_NO_ROOM},
        // Odd pictures have no 4:2:x form: refused after a buffer was made.
        {"3x3 into NV21", odd, VC_FORMAT_NV21, 0, false, VC_ERROR_INVALID_SIZE,
         VC_DECODE_CONVERSION},
        {"3x3 into an NV21 buffer", odd, VC_FORMAT_NV21, 8, true, VC_ERROR_INVALID_SIZE,
         VC_DECODE_CONVERSION},
        {"3x3 into YUYV", odd, VC_FORMAT_YUYV, 0, false, VC_ERROR_INVALID_SIZE,
         VC_DECODE_CONVERSION},
        {"into an unknown format", jpeg, kUnknown, 0, false, VC_ERROR_INVALID_PARAM,
         VC_DECODE_CONVERSION},
        {"truncated PNG", Bytes(png.begin(), png.begin() + png.size() * 2 / 3), VC_FORMAT_RGBA, 5,
         false, VC_ERROR_CODEC_FAILED, VC_DECODE_TRUNCATED},
        {"PNG with a bad checksum", pngBadCrc, VC_FORMAT_RGBA, 5, false, VC_ERROR_CODEC_FAILED,
         VC_DECODE_CORRUPT},
        {"PNG of 50000x30000", pngDeclaring(50000, 30000), VC_FORMAT_RGBA, 5, false,
         VC_ERROR_CODEC_FAILED, VC_DECODE_TOO_LARGE},
        {"PNG of 2000000x2", pngDeclaring(2000000, 2), VC_FORMAT_RGBA, 5, false,
         VC_ERROR_CODEC_FAILED, VC_DECODE_TOO_LARGE},
    };
    for (const Case& c : cases) {
        VCImage* target = c.buffer ? VCImage_createNew(c.side, c.side, c.format)
                                   : VCImage_createEmpty(c.side, c.side, c.format);
        ASSERT_NE(target, nullptr) << c.what;
        const std::string before = recordOf(target);
        log.clear();
        EXPECT_EQ(VCImage_decodeFromJpeg(target, c.data.data(), static_cast<int>(c.data.size())),
                  c.status)
            << c.what;
        EXPECT_EQ(VCPicture_lastFailure(), c.why) << c.what;
        // One error line, where the failure arose.
        EXPECT_EQ(countErrors(log, VCError_name(c.status), c.status), 1) << c.what;
        size_t errors = 0;
        for (const LoggedLine& l : log.lines()) errors += l.level == VF_LOG_ERROR;
        EXPECT_EQ(errors, 1u) << c.what;
        EXPECT_EQ(recordOf(target), before) << c.what;
        VCImage_destroy(target);
    }
    // Each reason has words of its own.
    std::set<std::string> texts;
    for (const Case& c : cases) texts.insert(VCPicture_failureText(c.why));
    EXPECT_EQ(texts.size(), 8u);

    // The valid streams these were made from do decode, and say so.
    image = VCImage_createEmpty(0, 0, VC_FORMAT_RGBA);
    EXPECT_EQ(VCImage_decodeFromJpeg(image, png.data(), static_cast<int>(png.size())), 0);
    EXPECT_EQ(VCPicture_lastFailure(), VC_DECODE_OK);
    EXPECT_EQ(image->width, 16);
    VCImage_deallocate(image);
    EXPECT_EQ(VCImage_decodeFromJpeg(image, jpeg.data(), static_cast<int>(jpeg.size())), 0);
    EXPECT_EQ(image->width, 32);
    VCImage_destroy(image);

    // The reason belongs to the thread that decoded.
    ASSERT_NE(VCImage_decodeFromJpeg(nullptr, jpeg.data(), 1), 0);
    VCDecodeFailure other = VC_DECODE_NOT_A_PICTURE;
    std::thread([&] {
        VCImage* mine = VCImage_createEmpty(0, 0, VC_FORMAT_RGBA);
        VCImage_decodeFromJpeg(mine, jpeg.data(), static_cast<int>(jpeg.size()));
        other = VCPicture_lastFailure();
        VCImage_destroy(mine);
    }).join();
    EXPECT_EQ(other, VC_DECODE_OK);
    EXPECT_EQ(VCPicture_lastFailure(), VC_DECODE_NOT_A_PICTURE);
}

TEST(VcJpeg, HeaderAloneGivesTheDeclaredSize) {
    VCImage* source = makeRgba(32, 24);
    Bytes jpeg = encodeBytes(source, 90);
    VCImage_destroy(source);
    LogCapture log;
    struct Case {
        Bytes data;
        int status, width, height;
        VCDecodeFailure why;
    } cases[] = {
        {jpeg, 0, 32, 24, VC_DECODE_OK},
        {jpegDeclaring(jpeg, 30000, 20000), 0, 30000, 20000, VC_DECODE_OK},
        {pngDeclaring(20000, 17), 0, 20000, 17, VC_DECODE_OK},
        {Bytes(jpeg.begin(), jpeg.begin() + 40), VC_ERROR_CODEC_FAILED, -1, -1,
         VC_DECODE_TRUNCATED},
        {Bytes(64, 'x'), VC_ERROR_CODEC_FAILED, -1, -1, VC_DECODE_NOT_A_PICTURE},
    };
    for (const Case& c : cases) {
        int w = -1, h = -1;
        EXPECT_EQ(VCPicture_readHeader(c.data.data(), static_cast<int>(c.data.size()), &w, &h),
                  c.status);
        EXPECT_EQ(w, c.width);
        EXPECT_EQ(h, c.height);
        EXPECT_EQ(VCPicture_lastFailure(), c.why);
    }
    int w = 0;
    EXPECT_EQ(VCPicture_readHeader(jpeg.data(), 0, &w, &w), VC_ERROR_NULL_PARAM);
    EXPECT_EQ(VCPicture_readHeader(nullptr, 10, &w, &w), VC_ERROR_NULL_PARAM);
    EXPECT_EQ(countErrors(log, "VC_ERROR_CODEC_FAILED", -9), 2);
    EXPECT_EQ(countErrors(log, "VC_ERROR_NULL_PARAM", -2), 2);
}

// CMYK and YCCK JPEGs (print workflows, some scanners) become RGB through the
// inks: each channel is its ink's light times black's light.
TEST(VcJpeg, CmykAndYcckDecodeThroughTheirInks) {
    REQUIRE_GENERAL_CODECS();
    const int w = 48, h = 32;
    Bytes cmyk(static_cast<size_t>(w) * h * 4);
    for (int y = 0; y < h; ++y)
        for (int x = 0; x < w; ++x) {
            unsigned char* p = &cmyk[(static_cast<size_t>(y) * w + x) * 4];
            p[0] = static_cast<unsigned char>(40 + x * 4);
            p[1] = static_cast<unsigned char>(60 + y * 5);
            p[2] = 200;
            p[3] = static_cast<unsigned char>(255 - (x + y));
        }
    struct Case {
        const char* what;
        J_COLOR_SPACE stored;
        bool adobe;  // inks stored inverted, as Adobe's marker says
    } cases[] = {
        {"CMYK", JCS_CMYK, true}, {"YCCK", JCS_YCCK, true}, {"plain CMYK", JCS_CMYK, false}};
    for (const Case& c : cases) {
        Bytes stream = makeJpeg(w, h, JCS_CMYK, 4, c.stored, cmyk, c.adobe);
        int rc = 1;
        VCImage* rgba = decodeInto(VC_FORMAT_RGBA, stream, &rc);
        ASSERT_EQ(rc, 0) << c.what;
        ASSERT_EQ(shapeOf(rgba), "48x32");
        // Quality 100; YCCK's chroma is subsampled, so edges move a little more.
        int worst = 0;
        for (size_t i = 0; i < static_cast<size_t>(w) * h; ++i) {
            const unsigned char* ink = &cmyk[i * 4];
            unsigned k = c.adobe ? ink[3] : 255u - ink[3];
            for (int ch = 0; ch < 3; ++ch) {
                unsigned light = c.adobe ? ink[ch] : 255u - ink[ch];
                int want = static_cast<int>((light * k + 127) / 255);
                worst = std::max(worst, std::abs(want - rgba->data[i * 4 + ch]));
            }
            ASSERT_EQ(rgba->data[i * 4 + 3], 255);
        }
        EXPECT_LE(worst, 4) << c.what << ": largest deviation from the ink products";
        VCImage_destroy(rgba);
    }
}

namespace {

PngPicture pngOf(int width, int height, int colorType, int bitDepth, Bytes samples) {
    PngPicture p;
    p.width = width;
    p.height = height;
    p.colorType = colorType;
    p.bitDepth = bitDepth;
    p.samples = std::move(samples);
    return p;
}

}  // namespace

TEST(VcPng, DecodesEveryColourTypeKeepingColourUnderTransparency) {
    PngPicture palette = pngOf(3, 1, PNG_COLOR_TYPE_PALETTE, 8, {2, 0, 1});
    palette.palette = {{10, 20, 30}, {40, 50, 60}, {70, 80, 90}};
    palette.paletteAlpha = {0, 77};
    PngPicture interlaced = pngOf(9, 7, PNG_COLOR_TYPE_RGB_ALPHA, 8, Bytes(9 * 7 * 4));
    interlaced.interlaced = true;
    for (int y = 0; y < 7; ++y)
        for (int x = 0; x < 9; ++x) gradientPixel(x, y, 9, 7, &interlaced.samples[(y * 9 + x) * 4]);
    struct Case {
        const char* what;
        PngPicture picture;
        Bytes rgba;
    } cases[] = {
        // Unpremultiplied: a transparent pixel keeps its colour.
        {"RGBA",
         pngOf(3, 1, PNG_COLOR_TYPE_RGB_ALPHA, 8, {200, 100, 50, 0, 10, 20, 30, 128, 1, 2, 3, 255}),
         {200, 100, 50, 0, 10, 20, 30, 128, 1, 2, 3, 255}},
        {"grey", pngOf(2, 1, PNG_COLOR_TYPE_GRAY, 8, {7, 250}), {7, 7, 7, 255, 250, 250, 250, 255}},
        {"1-bit grey",
         pngOf(3, 1, PNG_COLOR_TYPE_GRAY, 1, {0xA0}),
         {255, 255, 255, 255, 0, 0, 0, 255, 255, 255, 255, 255}},
        {"grey and alpha", pngOf(1, 1, PNG_COLOR_TYPE_GRAY_ALPHA, 8, {90, 0}), {90, 90, 90, 0}},
        {"RGB", pngOf(1, 1, PNG_COLOR_TYPE_RGB, 8, {1, 2, 3}), {1, 2, 3, 255}},
        {"16-bit RGB",
         pngOf(1, 1, PNG_COLOR_TYPE_RGB, 16, {0x80, 0x80, 0x40, 0x40, 0xFF, 0xFF}),
         {0x80, 0x40, 0xFF, 255}},
        {"palette", palette, {70, 80, 90, 255, 10, 20, 30, 0, 40, 50, 60, 77}},
        {"interlaced", interlaced, interlaced.samples},
    };
    for (const Case& c : cases) {
        Bytes png = makePng(c.picture);
        int rc = 1;
        VCImage* image = decodeInto(VC_FORMAT_RGBA, png, &rc);
        ASSERT_EQ(rc, 0) << c.what;
        EXPECT_EQ(shapeOf(image),
                  std::to_string(c.picture.width) + "x" + std::to_string(c.picture.height))
            << c.what;
        EXPECT_EQ(bytesOf(image), c.rgba) << c.what;
        VCImage_destroy(image);
    }

    int rc = 1;
    VCImage* bgra = decodeInto(VC_FORMAT_BGRA, makePng(cases[0].picture), &rc);
    ASSERT_EQ(rc, 0);
    EXPECT_EQ(Bytes(bgra->data, bgra->data + 12),
              Bytes({50, 100, 200, 0, 30, 20, 10, 128, 3, 2, 1, 255}));
    VCImage_destroy(bgra);
}
