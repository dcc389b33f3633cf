// JPEG and PNG coding of image records through the general codecs
// (TurboJPEG, libpng), with the platform's fast codec absent.
#include <gtest/gtest.h>
#include <string.h>
#include <turbojpeg.h>

#include <algorithm>
#include <cmath>
#include <set>
#include <thread>

#include "jpeg_standin/jpeg_test_util.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_file.h"
#include "vccore/vc_log.h"
#include "vccore/vc_picture.h"
#include "vccore/vc_stream.h"

using namespace jpegtest;

namespace {

#define REQUIRE_GENERAL_CODECS() \
    if (fastCodecInstalled()) GTEST_SKIP() << "the fast codec is installed here"

Bytes turboDecode(const Bytes& jpeg, int pixelFormat, int* subsampling = nullptr) {
    tjhandle tj = tjInitDecompress();
    int w = 0, h = 0, sub = -1, colorspace = 0;
    Bytes out;
    if (tjDecompressHeader3(tj, jpeg.data(), jpeg.size(), &w, &h, &sub, &colorspace) == 0) {
        out.resize(static_cast<size_t>(w) * h * tjPixelSize[pixelFormat]);
        if (tjDecompress2(tj, jpeg.data(), jpeg.size(), out.data(), w, 0, h, pixelFormat, 0) != 0)
            out.clear();
    }
    if (subsampling != nullptr) *subsampling = sub;
    tjDestroy(tj);
    return out;
}

// JPEG's loss on the test picture at quality 95 (its sharp blocks ring): a
// mean difference of 3 to 5; swapped chroma or a wrong quality is far more.
double meanAbsDiff(const Bytes& a, const Bytes& b) {
    double sum = 0;
    for (size_t i = 0; i < a.size(); ++i) sum += std::abs(a[i] - b[i]);
    return a.size() == b.size() && !a.empty() ? sum / a.size() : 1e9;
}

// Pixels converted by the image core (whose arithmetic has its own suite)
// into `format`, optionally with the chroma plane displaced to `chromaAt`.
Bytes convertTo(const VCImage* source, uint32_t format, uint32_t chromaAt = 0) {
    const size_t need = VCImage_requiredSize(source->width, source->height, format);
    const size_t luma = static_cast<size_t>(source->width) * source->height;
    Bytes out(chromaAt != 0 ? chromaAt + need - luma : need, 0xEE);
    ImagePtr target =
        VCImageTest_wrap(out.data(), source->width, source->height, format, out.size(), chromaAt);
    EXPECT_EQ(VC_OK, VCImage_convert(source, target.get()));
    return out;
}
Bytes convertBytes(Bytes pixels, int w, int h, uint32_t from, uint32_t to) {
    return convertTo(VCImageTest_wrap(pixels.data(), w, h, from).get(), to);
}

ImagePtr decodeInto(uint32_t format, const Bytes& data, int* rc) {
    ImagePtr image(VCImage_createEmpty(0, 0, format));
    *rc = VCImage_decodeFromJpeg(image.get(), data.data(), static_cast<int>(data.size()));
    return image;
}

TEST(VcJpeg, EncodeMakesAJpegRecordAtItsQuality) {
    REQUIRE_GENERAL_CODECS();
    ImagePtr image = makeRgba(64, 48);
    ImagePtr jpeg(VCImage_encodeToJpeg(image.get(), 90));
    ASSERT_NE(jpeg, nullptr);
    EXPECT_EQ("64x48 JPEG wrapped 0 size " + std::to_string(jpeg->size) + " uv 0",
              VCImageTest_record(jpeg.get()));
    const Bytes stream = VCImageTest_bytes(*jpeg);
    ASSERT_GT(stream.size(), 100u);
    EXPECT_EQ(Bytes({0xFF, 0xD8, 0xFF, 0xD9}),
              Bytes({stream[0], stream[1], stream[stream.size() - 2], stream.back()}));
    int sub = -1;
    EXPECT_EQ(64u * 48 * 4, turboDecode(stream, TJPF_RGBA, &sub).size());
    EXPECT_EQ(sub, TJSAMP_420);
    for (int quality : {1, 50, 85, 100})
        EXPECT_EQ(lumaTableForQuality(quality), lumaTable(encodeJpeg(image.get(), quality)))
            << quality;
    // Out-of-range qualities are 85, not clamped to the nearest end.
    for (int quality : {0, 101, -7})
        EXPECT_EQ(encodeJpeg(image.get(), quality), encodeJpeg(image.get(), 85)) << quality;
}

// NV21 and NV12 are decoded a band of rows at a time; the result must be the
// whole picture decoded to RGBA (by TurboJPEG) and then converted, byte for
// byte, whatever the stream's sampling, scan structure and size; also into a
// caller's buffer whose chroma plane is kept apart (a padded camera buffer).
TEST(VcJpeg, BandedDecodeEqualsWholeDecodeAndConversion) {
    REQUIRE_GENERAL_CODECS();
    const struct {
        int w, h, subsampling, flags;
    } cases[] = {{64, 48, TJSAMP_420, 0},  {250, 38, TJSAMP_420, 0},  // bands of 16, 16 and 6
                 {96, 34, TJSAMP_422, 0},  {48, 18, TJSAMP_444, TJFLAG_PROGRESSIVE},
                 {40, 20, TJSAMP_GRAY, 0}, {2, 2, TJSAMP_420, 0}};
    for (const auto& c : cases) {
        SCOPED_TRACE(std::to_string(c.w) + "x" + std::to_string(c.h));
        // A handle per picture: TurboJPEG keeps the progressive setting on one.
        tjhandle tj = tjInitCompress();
        ImagePtr source = makeRgba(c.w, c.h);
        unsigned char* stream = nullptr;
        unsigned long length = 0;
        ASSERT_EQ(0, tjCompress2(tj, source->data, c.w, 0, c.h, TJPF_RGBA, &stream, &length,
                                 c.subsampling, 90, c.flags));
        Bytes jpeg(stream, stream + length);
        tjFree(stream);
        tjDestroy(tj);
        Bytes whole = turboDecode(jpeg, TJPF_RGBA);
        ASSERT_FALSE(whole.empty());
        int rc = 1;
        for (uint32_t format : {VC_FORMAT_NV21, VC_FORMAT_NV12}) {
            ImagePtr decoded = decodeInto(format, jpeg, &rc);
            ASSERT_EQ(rc, 0);
            EXPECT_EQ(convertBytes(whole, c.w, c.h, VC_FORMAT_RGBA, format),
                      VCImageTest_bytes(*decoded));
        }
        const uint32_t chromaAt = c.w * c.h + 64;
        Bytes caller(chromaAt + c.w * c.h / 2, 0xEE);
        ImagePtr padded = VCImageTest_wrap(caller.data(), c.w, c.h, VC_FORMAT_NV21, 0, chromaAt);
        ASSERT_EQ(0, VCImage_decodeFromJpeg(padded.get(), jpeg.data(), jpeg.size()));
        EXPECT_EQ(convertTo(VCImageTest_wrap(whole.data(), c.w, c.h, VC_FORMAT_RGBA).get(),
                            VC_FORMAT_NV21, chromaAt),
                  caller);
    }
    // PNG too, interlaced (whole first) or not (row by row).
    for (bool interlaced : {false, true}) {
        PngPicture picture;
        picture.width = 36;
        picture.height = 22;
        picture.interlaced = interlaced;
        picture.samples = makeTestPicture(36, 22, true);
        int rc = 1;
        ImagePtr decoded = decodeInto(VC_FORMAT_NV21, makePng(picture), &rc);
        ASSERT_EQ(rc, 0) << interlaced;
        EXPECT_EQ(convertBytes(picture.samples, 36, 22, VC_FORMAT_RGBA, VC_FORMAT_NV21),
                  VCImageTest_bytes(*decoded))
            << interlaced;
    }
}

TEST(VcJpeg, DecodeIntoNewAndExistingBuffers) {
    REQUIRE_GENERAL_CODECS();
    const Bytes jpeg = encodeJpeg(makeRgba(64, 48).get(), 95), ref = turboDecode(jpeg, TJPF_RGBA);
    // An owned buffer of the right size is decoded into in place.
    ImagePtr owned(VCImage_createNew(64, 48, VC_FORMAT_RGBA));
    unsigned char* before = owned->data;
    ASSERT_EQ(0, VCImage_decodeFromJpeg(owned.get(), jpeg.data(), jpeg.size()));
    EXPECT_EQ(owned->data, before);
    EXPECT_EQ(ref, VCImageTest_bytes(*owned));  // opaque: TurboJPEG's RGBA is
    EXPECT_LT(meanAbsDiff(ref, makeTestPicture(64, 48, true)), 4.0);
    // A header only gets a buffer of its own; RGB orders are the RGBA's converted.
    int rc = 1;
    ImagePtr bgr = decodeInto(VC_FORMAT_BGR8, jpeg, &rc);
    ASSERT_EQ(rc, 0);
    EXPECT_EQ("64x48 BGR8 wrapped 0 size 9216 uv 0", VCImageTest_record(bgr.get()));
    EXPECT_EQ(convertBytes(ref, 64, 48, VC_FORMAT_RGBA, VC_FORMAT_BGR8), VCImageTest_bytes(*bgr));
    // A wrapped buffer stays the caller's; its size field is its capacity.
    Bytes caller(64 * 48 * 4, 0);
    ImagePtr wrapped = VCImageTest_wrap(caller.data(), 1, 1, VC_FORMAT_RGBA, caller.size());
    ASSERT_EQ(0, VCImage_decodeFromJpeg(wrapped.get(), jpeg.data(), jpeg.size()));
    EXPECT_EQ(wrapped->data, caller.data());
    EXPECT_EQ("64x48 RGBA wrapped 1 size 12288 uv 0", VCImageTest_record(wrapped.get()));
    EXPECT_EQ(caller, ref);
    // Too small by its size field, or by the geometry it was made for:
    // refused before anything changes, as decoding would run past its end.
    Bytes small(400, 0x5A);
    for (int size : {400, 0}) {
        ImagePtr image = VCImageTest_wrap(small.data(), 10, 10, VC_FORMAT_RGBA, size);
        EXPECT_EQ(VC_ERROR_INVALID_SIZE,
                  VCImage_decodeFromJpeg(image.get(), jpeg.data(), jpeg.size()));
        EXPECT_EQ(10, image->width);
        EXPECT_EQ(small, Bytes(400, 0x5A));
    }
}

TEST(VcJpeg, EncodesYuvPictures) {
    REQUIRE_GENERAL_CODECS();
    const int w = 64, h = 48;
    ImagePtr source = makeRgba(w, h);
    Bytes nv21 = convertTo(source.get(), VC_FORMAT_NV21);
    const Bytes fromNv21 =
        encodeJpeg(VCImageTest_wrap(nv21.data(), w, h, VC_FORMAT_NV21).get(), 95);
    int sub = -1;
    EXPECT_LT(meanAbsDiff(turboDecode(fromNv21, TJPF_RGB, &sub),
                          convertBytes(nv21, w, h, VC_FORMAT_NV21, VC_FORMAT_RGB8)),
              6.5);
    EXPECT_EQ(sub, TJSAMP_420);
    // The same samples in any 4:2:0 layout, or behind a displaced chroma
    // plane, make the very same stream.
    for (uint32_t format : {VC_FORMAT_NV12, VC_FORMAT_YV12, VC_FORMAT_YUVP, VC_FORMAT_NV21}) {
        const uint32_t chromaAt = format == VC_FORMAT_NV21 ? w * h + 256 : 0;
        Bytes laid = convertTo(source.get(), format, chromaAt);
        EXPECT_EQ(fromNv21,
                  encodeJpeg(
                      VCImageTest_wrap(laid.data(), w, h, format, laid.size(), chromaAt).get(), 95))
            << VCImageTest_fourcc(format);
    }
    // Packed 4:2:2 keeps its horizontal subsampling; grey makes one component.
    const struct {
        uint32_t format;
        int pixelFormat, subsampling;
        uint32_t compareAs;
    } rows[] = {{VC_FORMAT_YUYV, TJPF_RGB, TJSAMP_422, VC_FORMAT_RGB8},
                {VC_FORMAT_YVYU, TJPF_RGB, TJSAMP_422, VC_FORMAT_RGB8},
                {VC_FORMAT_GREY, TJPF_GRAY, TJSAMP_GRAY, VC_FORMAT_GREY}};
    for (const auto& r : rows) {
        Bytes packed = convertTo(source.get(), r.format);
        Bytes back =
            turboDecode(encodeJpeg(VCImageTest_wrap(packed.data(), w, h, r.format).get(), 95),
                        r.pixelFormat, &sub);
        EXPECT_EQ(sub, r.subsampling);
        EXPECT_LT(meanAbsDiff(back, convertBytes(packed, w, h, r.format, r.compareAs)), 4.5)
            << VCImageTest_fourcc(r.format);
    }
}

TEST(VcJpeg, DecodeFailuresSayWhyAndLeaveTheRecordAsFound) {
    REQUIRE_GENERAL_CODECS();
    const Bytes jpeg = encodeJpeg(makeRgba(32, 32).get(), 90);
    const Bytes odd = encodeJpeg(makeRgba(3, 3).get(), 90);
    ASSERT_FALSE(jpeg.empty());
    Bytes badTable = jpeg, twelveBit = jpeg, lossless = jpeg;
    badTable[findMarker(jpeg, 0xDB) + 2] = 0x07;  // table index out of range
    twelveBit[findMarker(jpeg, 0xC0) + 2] = 12;
    lossless[findMarker(jpeg, 0xC0) - 1] = 0xC3;
    // Two channels of no known colour space.
    Bytes twoChannels = makeJpeg(8, 8, JCS_UNKNOWN, 2, JCS_UNKNOWN, Bytes(8 * 8 * 2, 99));
    PngPicture picture;
    picture.width = picture.height = 16;
    picture.samples.assign(16 * 16 * 4, 0x80);
    const Bytes png = makePng(picture);
    Bytes pngBadCrc = png;
    pngBadCrc[29] ^= 0x55;  // inside the header chunk's checksum
    const Bytes half(jpeg.begin(), jpeg.begin() + jpeg.size() / 2);
    const char garbage[] = "hello, this is not a picture";
    using namespace fourcc;
    const int kCodec = VC_ERROR_CODEC_FAILED, kSize = VC_ERROR_INVALID_SIZE;
    const struct {
        const char* what;
        Bytes data;
        uint32_t format;
        int side;     // the record's preset square geometry
        bool buffer;  // whether the record owns a buffer of that geometry
        int status;
        VCDecodeFailure why;
    } cases[] = {
        {"garbage", Bytes(garbage, garbage + sizeof(garbage)), RGBA, 5, false, kCodec,
         VC_DECODE_NOT_A_PICTURE},
        {"truncated", half, RGBA, 5, false, kCodec, VC_DECODE_TRUNCATED},
        {"truncated into NV21", half, NV21, 40, true, kCodec, VC_DECODE_TRUNCATED},
        {"marker only", {0xFF, 0xD8}, RGBA, 5, false, kCodec, VC_DECODE_TRUNCATED},
        {"bad quantisation table", badTable, RGBA, 5, false, kCodec, VC_DECODE_CORRUPT},
        {"12-bit", twelveBit, RGBA, 5, false, kCodec, VC_DECODE_UNSUPPORTED_CODING},
        {"lossless", lossless, RGBA, 5, false, kCodec, VC_DECODE_UNSUPPORTED_CODING},
        {"two channels", twoChannels, RGBA, 5, false, kCodec, VC_DECODE_UNSUPPORTED_COLOR},
        {"65000x65000", jpegDeclaring(jpeg, 65000, 65000), RGBA, 5, false, kCodec,
         VC_DECODE_TOO_LARGE},
        // 3.6 GB of RGBA fits the record's byte count but not its buffers.
        {"30000x30000", jpegDeclaring(jpeg, 30000, 30000), RGBA, 0, false, kSize,
         VC_DECODE_TOO_LARGE},
        {"30000x30000 BGR8", jpegDeclaring(jpeg, 30000, 30000), BGR8, 0, false, kSize,
         VC_DECODE_TOO_LARGE},
        {"into a buffer too small", jpeg, RGBA, 10, true, kSize, VC_DECODE_NO_ROOM},
        // Odd pictures have no 4:2:x form: refused after a buffer was made.
        {"3x3 into NV21", odd, NV21, 0, false, kSize, VC_DECODE_CONVERSION},
        {"3x3 into an NV21 buffer", odd, NV21, 8, true, kSize, VC_DECODE_CONVERSION},
        {"3x3 into YUYV", odd, YUYV, 0, false, kSize, VC_DECODE_CONVERSION},
        {"into an unknown format", jpeg, VC_FOURCC('X', 'X', 'X', 'X'), 0, false,
         VC_ERROR_INVALID_PARAM, VC_DECODE_CONVERSION},
        {"truncated PNG", Bytes(png.begin(), png.begin() + png.size() * 2 / 3), RGBA, 5, false,
         kCodec, VC_DECODE_TRUNCATED},
        {"PNG with a bad checksum", pngBadCrc, RGBA, 5, false, kCodec, VC_DECODE_CORRUPT},
        {"PNG of 50000x30000", pngDeclaring(50000, 30000), RGBA, 5, false, kCodec,
         VC_DECODE_TOO_LARGE},
        {"PNG of 2000000x2", pngDeclaring(2000000, 2), RGBA, 5, false, kCodec, VC_DECODE_TOO_LARGE},
    };
    std::set<std::string> texts;
    for (const auto& c : cases) {
        ImagePtr target(c.buffer ? VCImage_createNew(c.side, c.side, c.format)
                                 : VCImage_createEmpty(c.side, c.side, c.format));
        ASSERT_NE(target, nullptr) << c.what;
        const unsigned char* data = target->data;
        const std::string before = VCImageTest_record(target.get());
        LogCapture log;
        EXPECT_EQ(c.status, VCImage_decodeFromJpeg(target.get(), c.data.data(), c.data.size()))
            << c.what;
        EXPECT_EQ(c.why, VCPicture_lastFailure()) << c.what;
        // One error line, where the failure arose.
        EXPECT_TRUE(log.matches({"E " + std::string(VCError_name(c.status)) + " (" +
                                 std::to_string(c.status) + "): vccore/src/vc_image:#"}))
            << c.what;
        EXPECT_EQ(before, VCImageTest_record(target.get())) << c.what;
        EXPECT_EQ(data, target->data) << c.what;
        texts.insert(VCPicture_failureText(c.why));
    }
    EXPECT_EQ(texts.size(), 8u);  // each reason has words of its own
    // Null and negative arguments.
    ImagePtr image(VCImage_createEmpty(5, 5, VC_FORMAT_RGBA));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_decodeFromJpeg(nullptr, jpeg.data(), 10));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_decodeFromJpeg(image.get(), nullptr, 10));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_decodeFromJpeg(image.get(), jpeg.data(), 0));
    EXPECT_EQ(VC_ERROR_INVALID_PARAM, VCImage_decodeFromJpeg(image.get(), jpeg.data(), -3));
    EXPECT_EQ(VCPicture_lastFailure(), VC_DECODE_NOT_A_PICTURE);
    // The valid streams these were made from decode, and say so.
    EXPECT_EQ(0, VCImage_decodeFromJpeg(image.get(), png.data(), png.size()));
    EXPECT_EQ(VCPicture_lastFailure(), VC_DECODE_OK);
    EXPECT_EQ(16, image->width);
    // The reason belongs to the thread that decoded.
    ASSERT_NE(0, VCImage_decodeFromJpeg(nullptr, jpeg.data(), 1));
    VCDecodeFailure other = VC_DECODE_NOT_A_PICTURE;
    std::thread([&] {
        ImagePtr mine(VCImage_createEmpty(0, 0, VC_FORMAT_RGBA));
        VCImage_decodeFromJpeg(mine.get(), jpeg.data(), jpeg.size());
        other = VCPicture_lastFailure();
    }).join();
    EXPECT_EQ(other, VC_DECODE_OK);
    EXPECT_EQ(VCPicture_lastFailure(), VC_DECODE_NOT_A_PICTURE);
}

TEST(VcJpeg, HeaderAloneGivesTheDeclaredSize) {
    const Bytes jpeg = encodeJpeg(makeRgba(32, 24).get(), 90);
    const struct {
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
    for (const auto& c : cases) {
        int w = -1, h = -1;
        EXPECT_EQ(c.status, VCPicture_readHeader(c.data.data(), c.data.size(), &w, &h));
        EXPECT_EQ(std::to_string(c.width) + "x" + std::to_string(c.height),
                  std::to_string(w) + "x" + std::to_string(h));
        EXPECT_EQ(c.why, VCPicture_lastFailure());
    }
    int w = 0;
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCPicture_readHeader(jpeg.data(), 0, &w, &w));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCPicture_readHeader(nullptr, 10, &w, &w));
}

// CMYK and YCCK JPEGs (print workflows, some scanners) become RGB through the
// inks: each channel is its ink's light times black's light; Adobe's marker
// says the inks are stored inverted.
TEST(VcJpeg, CmykAndYcckDecodeThroughTheirInks) {
    REQUIRE_GENERAL_CODECS();
    const int w = 48, h = 32;
    Bytes cmyk(static_cast<size_t>(w) * h * 4);
    for (int y = 0; y < h; ++y)
        for (int x = 0; x < w; ++x) {
            unsigned char* p = &cmyk[(static_cast<size_t>(y) * w + x) * 4];
            p[0] = 40 + x * 4, p[1] = 60 + y * 5, p[2] = 200, p[3] = 255 - (x + y);
        }
    for (auto c : {std::make_pair(JCS_CMYK, true), {JCS_YCCK, true}, {JCS_CMYK, false}}) {
        int rc = 1;
        ImagePtr rgba =
            decodeInto(VC_FORMAT_RGBA, makeJpeg(w, h, JCS_CMYK, 4, c.first, cmyk, c.second), &rc);
        ASSERT_EQ(rc, 0);
        ASSERT_EQ(w * h * 4u, VCImage_size(rgba.get()));
        // Quality 100; YCCK's chroma is subsampled, so edges move a little more.
        int worst = 0;
        for (size_t i = 0; i < static_cast<size_t>(w) * h; ++i) {
            const unsigned char* ink = &cmyk[i * 4];
            const unsigned k = c.second ? ink[3] : 255u - ink[3];
            for (int ch = 0; ch < 3; ++ch) {
                const unsigned light = c.second ? ink[ch] : 255u - ink[ch];
                const int want = static_cast<int>((light * k + 127) / 255);
                worst = std::max(worst, std::abs(want - rgba->data[i * 4 + ch]));
            }
            ASSERT_EQ(rgba->data[i * 4 + 3], 255);
        }
        EXPECT_LE(worst, 4) << c.first << " " << c.second;
    }
}

PngPicture pngOf(int width, int height, int colorType, int bitDepth, Bytes samples) {
    PngPicture p;
    p.width = width, p.height = height, p.colorType = colorType, p.bitDepth = bitDepth;
    p.samples = std::move(samples);
    return p;
}

TEST(VcPng, DecodesEveryColourTypeKeepingColourUnderTransparency) {
    PngPicture palette = pngOf(3, 1, PNG_COLOR_TYPE_PALETTE, 8, {2, 0, 1});
    palette.palette = {{10, 20, 30}, {40, 50, 60}, {70, 80, 90}};
    palette.paletteAlpha = {0, 77};
    PngPicture interlaced = pngOf(9, 7, PNG_COLOR_TYPE_RGB_ALPHA, 8, makeTestPicture(9, 7, false));
    interlaced.interlaced = true;
    const Bytes straight = {200, 100, 50, 0, 10, 20, 30, 128, 1, 2, 3, 255};
    const struct {
        const char* what;
        PngPicture picture;
        uint32_t format;
        Bytes pixels;
    } cases[] = {
        // Unpremultiplied: a transparent pixel keeps its colour.
        {"RGBA", pngOf(3, 1, PNG_COLOR_TYPE_RGB_ALPHA, 8, straight), VC_FORMAT_RGBA, straight},
        {"into BGRA",
         pngOf(3, 1, PNG_COLOR_TYPE_RGB_ALPHA, 8, straight),
         VC_FORMAT_BGRA,
         {50, 100, 200, 0, 30, 20, 10, 128, 3, 2, 1, 255}},
        {"grey",
         pngOf(2, 1, PNG_COLOR_TYPE_GRAY, 8, {7, 250}),
         VC_FORMAT_RGBA,
         {7, 7, 7, 255, 250, 250, 250, 255}},
        {"1-bit grey",
         pngOf(3, 1, PNG_COLOR_TYPE_GRAY, 1, {0xA0}),
         VC_FORMAT_RGBA,
         {255, 255, 255, 255, 0, 0, 0, 255, 255, 255, 255, 255}},
        {"grey and alpha",
         pngOf(1, 1, PNG_COLOR_TYPE_GRAY_ALPHA, 8, {90, 0}),
         VC_FORMAT_RGBA,
         {90, 90, 90, 0}},
        {"RGB", pngOf(1, 1, PNG_COLOR_TYPE_RGB, 8, {1, 2, 3}), VC_FORMAT_RGBA, {1, 2, 3, 255}},
        {"16-bit RGB",
         pngOf(1, 1, PNG_COLOR_TYPE_RGB, 16, {0x80, 0x80, 0x40, 0x40, 0xFF, 0xFF}),
         VC_FORMAT_RGBA,
         {0x80, 0x40, 0xFF, 255}},
        {"palette", palette, VC_FORMAT_RGBA, {70, 80, 90, 255, 10, 20, 30, 0, 40, 50, 60, 77}},
        {"interlaced", interlaced, VC_FORMAT_RGBA, interlaced.samples},
    };
    for (const auto& c : cases) {
        int rc = 1;
        ImagePtr image = decodeInto(c.format, makePng(c.picture), &rc);
        ASSERT_EQ(rc, 0) << c.what;
        EXPECT_EQ(c.picture.width * 100 + c.picture.height, image->width * 100 + image->height);
        EXPECT_EQ(c.pixels, VCImageTest_bytes(*image)) << c.what;
    }
}

}  // namespace

// Stream rows decoded where the caller places them (straight into its memory
// for JPEG, through a copy for PNG): the rows of the packed decoding at the
// caller's pitch, the band told each time; a place refused stops the picture.
TEST(VcStream, RowsLandWhereTheCallerPlacesThem) {
    REQUIRE_GENERAL_CODECS();
    const int w = 50, h = 40, pitch = w * 4 + 12;
    ImagePtr source = makeRgba(w, h);
    const Bytes inputs[] = {encodeJpeg(source.get(), 90), encodePng(source.get())};
    struct Placing {
        Bytes rows;             // pitch apart
        std::vector<int> told;  // first rows the band was told of
        int refuseAt = -1;
    };
    auto place = [](void* user, int first, int) -> unsigned char* {
        Placing* p = static_cast<Placing*>(user);
        return first == p->refuseAt ? nullptr : p->rows.data() + (size_t)first * pitch;
    };
    auto told = [](void* user, const unsigned char* rgba, int first, int) {
        Placing* p = static_cast<Placing*>(user);
        EXPECT_EQ(rgba, p->rows.data() + (size_t)first * pitch);
        p->told.push_back(first);
        return 0;
    };
    for (const Bytes& input : inputs) {
        Bytes packed(w * h * 4);
        auto copy = [](void* user, const unsigned char* rgba, int first, int rows) {
            memcpy(static_cast<unsigned char*>(user) + first * w * 4, rgba, rows * w * 4);
            return 0;
        };
        VCStreamReader* reader = VCStreamReader_open(input.data(), input.size());
        int width = 0, height = 0;
        ASSERT_EQ(0, VCStreamReader_readHeader(reader, &width, &height));
        ASSERT_EQ(0, VCStreamReader_readBands(reader, 16, copy, packed.data()));
        VCStreamReader_close(reader);

        const struct {
            int refuseAt;
            size_t pitch;
            int status;
            std::vector<int> told;
        } cases[] = {{-1, pitch, 0, {0, 16, 32}},
                     {16, pitch, VC_ERROR_INVALID_STATE, {0}},
                     {-1, w * 4 - 1, VC_ERROR_INVALID_STATE, {}}};
        for (const auto& c : cases) {
            Placing placing{Bytes(pitch * h, 0xEE), {}, c.refuseAt};
            reader = VCStreamReader_open(input.data(), input.size());
            ASSERT_EQ(0, VCStreamReader_readHeader(reader, &width, &height));
            EXPECT_EQ(c.status,
                      VCStreamReader_readBandsInPlace(reader, 16, c.pitch, place, told, &placing));
            EXPECT_EQ(VC_DECODE_OK, VCStreamReader_failure(reader));
            VCStreamReader_close(reader);
            EXPECT_EQ(c.told, placing.told);
            for (int y = 0; c.status == 0 && y < h; ++y) {
                EXPECT_EQ(0, memcmp(&placing.rows[y * pitch], &packed[y * w * 4], w * 4)) << y;
                EXPECT_EQ(0xEE, placing.rows[y * pitch + w * 4]) << y;  // the padding untouched
            }
        }
    }
}

// A stream pulled from a source, in pieces of any size, decodes to the rows
// of the same bytes held whole (a JPEG with large segments to skip, a PNG);
// a source that ends early is a truncated picture, one that fails a read
// failure, and a source of anything else no reader at all.
TEST(VcStream, PulledBytesDecodeAsTheWholeOnes) {
    REQUIRE_GENERAL_CODECS();
    const int w = 50, h = 40;
    ImagePtr source = makeRgba(w, h);
    Bytes jpeg = encodeJpeg(source.get(), 90);
    // Two application segments no decoder keeps, skipped across many pulls.
    for (int i = 0; i < 2; ++i) {
        Bytes segment = {0xFF, 0xE9, 0xEA, 0x60};
        segment.resize(2 + 0xEA60, (unsigned char)(0x20 + i));
        jpeg.insert(jpeg.begin() + 2, segment.begin(), segment.end());
    }
    struct Pulling {
        const Bytes* bytes;
        size_t at;
        size_t piece;    // bytes per pull at most
        size_t failAt;  // a read failure from here
        size_t end;     // the stream ends here
    };
    auto pull = [](void* user, unsigned char* to, size_t count) -> long {
        Pulling* p = static_cast<Pulling*>(user);
        if (p->at >= p->failAt) return -1;
        const size_t n = std::min({count, p->piece, p->end - p->at, p->failAt - p->at});
        if (n > 0) memcpy(to, p->bytes->data() + p->at, n);
        p->at += n;
        return (long)n;
    };
    auto copy = [](void* user, const unsigned char* rgba, int first, int rows) {
        memcpy(static_cast<unsigned char*>(user) + first * w * 4, rgba, rows * w * 4);
        return 0;
    };
    for (const Bytes& input : {jpeg, encodePng(source.get())}) {
        Bytes whole(w * h * 4);
        VCStreamReader* reader = VCStreamReader_open(input.data(), input.size());
        int width = 0, height = 0;
        ASSERT_EQ(0, VCStreamReader_readHeader(reader, &width, &height));
        ASSERT_EQ(0, VCStreamReader_readBands(reader, 16, copy, whole.data()));
        VCStreamReader_close(reader);
        const size_t all = input.size(), none = SIZE_MAX;
        const struct {
            size_t piece, failAt, end;
            int status;
            VCDecodeFailure why;
        } cases[] = {{7, none, all, 0, VC_DECODE_OK},
                     {100000, none, all, 0, VC_DECODE_OK},
                     {1000, none, all - 300, VC_ERROR_CODEC_FAILED, VC_DECODE_TRUNCATED},
                     {1000, all - 300, all, VC_ERROR_CODEC_FAILED, VC_DECODE_READ_FAILED}};
        for (const auto& c : cases) {
            SCOPED_TRACE(testing::Message() << input.size() << " bytes, pieces of " << c.piece
                                            << ", ending at " << c.end << ", failing at "
                                            << c.failAt);
            Pulling pulling{&input, 0, c.piece, c.failAt, c.end};
            reader = VCStreamReader_openSource(pull, &pulling);
            ASSERT_NE(reader, nullptr);
            ASSERT_EQ(0, VCStreamReader_readHeader(reader, &width, &height));
            EXPECT_EQ(w, width);
            Bytes pulled(w * h * 4);
            EXPECT_EQ(c.status, VCStreamReader_readBands(reader, 16, copy, pulled.data()));
            EXPECT_EQ(c.why, VCStreamReader_failure(reader));
            VCStreamReader_close(reader);
            EXPECT_EQ(c.status == 0, pulled == whole);
        }
    }
    const char garbage[] = "hello, this is not a picture";
    const Bytes notPictures[] = {Bytes(garbage, garbage + sizeof(garbage)), Bytes{0xFF}, Bytes{}};
    for (const Bytes& input : notPictures) {
        Pulling pulling{&input, 0, 3, SIZE_MAX, input.size()};
        EXPECT_EQ(VCStreamReader_openSource(pull, &pulling), nullptr);
        EXPECT_EQ(VCPicture_lastFailure(), VC_DECODE_NOT_A_PICTURE);
    }
    EXPECT_EQ(VCStreamReader_openSource(nullptr, nullptr), nullptr);
}
