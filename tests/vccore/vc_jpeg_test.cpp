// JPEG and PNG coding of image records through the general codecs
// (TurboJPEG, libpng), with the platform's fast codec absent.
#include <gtest/gtest.h>
#include <string.h>
#include <turbojpeg.h>

#include <cmath>

#include "jpeg_standin/jpeg_test_util.h"
#include "support/log_capture.h"
#include "vccore/vc_file.h"
#include "vccore/vc_log.h"

using namespace jpegtest;

namespace {

#define REQUIRE_GENERAL_CODECS() \
    if (fastCodecInstalled()) GTEST_SKIP() << "the fast codec is installed here"

Bytes bytesOf(const VCImage* image) {
    return Bytes(image->data, image->data + image->size);
}

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

int clamp255(int v) {
    return v < 0 ? 0 : (v > 255 ? 255 : v);
}

// Full-range equations of the image core.
void rgbToYuv(const unsigned char* p, int* y, int* u, int* v) {
    *y = clamp255((19595 * p[0] + 38470 * p[1] + 7471 * p[2]) >> 16);
    *u = clamp255(((36962 * (p[2] - *y)) >> 16) + 128);
    *v = clamp255(((46727 * (p[0] - *y)) >> 16) + 128);
}

void yuvToRgb(int y, int u, int v, unsigned char* out) {
    double du = u - 128.0;
    double dv = v - 128.0;
    out[0] = static_cast<unsigned char>(clamp255(static_cast<int>(y + 1.402 * dv)));
    out[1] =
        static_cast<unsigned char>(clamp255(static_cast<int>(y - 0.34414 * du - 0.71414 * dv)));
    out[2] = static_cast<unsigned char>(clamp255(static_cast<int>(y + 1.772 * du)));
}

double meanAbsDiff(const unsigned char* a, int aStep, const unsigned char* b, int bStep,
                   size_t pixels, int channels) {
    double sum = 0;
    for (size_t i = 0; i < pixels; ++i)
        for (int c = 0; c < channels; ++c) sum += std::abs(a[i * aStep + c] - b[i * bStep + c]);
    return sum / (pixels * channels);
}

// Y, U, V planes (chroma per 2×2 block, point-sampled) of the gradient picture.
struct YuvPicture {
    int w, h;
    Bytes y, u, v;
};

YuvPicture makeYuv(int w, int h) {
    YuvPicture pic{w, h, Bytes(w * h), Bytes(w * h / 4), Bytes(w * h / 4)};
    unsigned char p[4];
    for (int row = 0; row < h; ++row)
        for (int x = 0; x < w; ++x) {
            gradientPixel(x, row, w, h, p);
            int y, u, v;
            rgbToYuv(p, &y, &u, &v);
            pic.y[row * w + x] = static_cast<unsigned char>(y);
            if (row % 2 == 0 && x % 2 == 0) {
                pic.u[(row / 2) * (w / 2) + x / 2] = static_cast<unsigned char>(u);
                pic.v[(row / 2) * (w / 2) + x / 2] = static_cast<unsigned char>(v);
            }
        }
    return pic;
}

// The picture laid out in a 4:2:0 format, chroma starting at `chromaAt`.
Bytes layout420(const YuvPicture& pic, uint32_t format, size_t chromaAt) {
    size_t luma = pic.y.size();
    size_t quarter = luma / 4;
    Bytes out(chromaAt + 2 * quarter, 0xEE);
    memcpy(out.data(), pic.y.data(), luma);
    unsigned char* c = out.data() + chromaAt;
    for (size_t i = 0; i < quarter; ++i) {
        switch (format) {
            case VC_FORMAT_NV21:
                c[2 * i] = pic.v[i];
                c[2 * i + 1] = pic.u[i];
                break;
            case VC_FORMAT_NV12:
                c[2 * i] = pic.u[i];
                c[2 * i + 1] = pic.v[i];
                break;
            case VC_FORMAT_YV12:
                c[i] = pic.v[i];
                c[quarter + i] = pic.u[i];
                break;
            case VC_FORMAT_YUVP:
                c[i] = pic.u[i];
                c[quarter + i] = pic.v[i];
                break;
        }
    }
    return out;
}

// The RGB picture that a YUV picture stands for (chroma shared per 2×2 block).
Bytes yuvAsRgb(const YuvPicture& pic) {
    Bytes out(pic.y.size() * 3);
    for (int row = 0; row < pic.h; ++row)
        for (int x = 0; x < pic.w; ++x) {
            size_t c = (row / 2) * (pic.w / 2) + x / 2;
            yuvToRgb(pic.y[row * pic.w + x], pic.u[c], pic.v[c], &out[(row * pic.w + x) * 3]);
        }
    return out;
}

VCImage* decodeInto(uint32_t format, const Bytes& data, int* rc) {
    VCImage* image = VCImage_createEmpty(0, 0, format);
    *rc = VCImage_decodeFromJpeg(image, data.data(), static_cast<int>(data.size()));
    return image;
}

// Offset of the first byte after a marker's two bytes, or 0.
size_t findMarker(const Bytes& jpeg, unsigned char marker) {
    for (size_t i = 2; i + 1 < jpeg.size(); ++i)
        if (jpeg[i] == 0xFF && jpeg[i + 1] == marker) return i + 2;
    return 0;
}

void putBe32(Bytes& out, uint32_t v) {
    for (int s = 24; s >= 0; s -= 8) out.push_back(static_cast<unsigned char>(v >> s));
}

// PNG chunk checksum (CRC-32, reflected polynomial 0xEDB88320).
uint32_t crc32Of(const unsigned char* p, size_t n) {
    uint32_t crc = 0xFFFFFFFFu;
    for (size_t i = 0; i < n; ++i) {
        crc ^= p[i];
        for (int k = 0; k < 8; ++k) crc = (crc >> 1) ^ (0xEDB88320u & (0u - (crc & 1u)));
    }
    return crc ^ 0xFFFFFFFFu;
}

void appendChunk(Bytes& png, const char* type, const Bytes& body) {
    putBe32(png, static_cast<uint32_t>(body.size()));
    size_t start = png.size();
    png.insert(png.end(), type, type + 4);
    png.insert(png.end(), body.begin(), body.end());
    putBe32(png, crc32Of(png.data() + start, png.size() - start));
}

// A well-formed PNG whose header declares width×height RGBA, with a tiny IDAT.
Bytes pngDeclaring(uint32_t width, uint32_t height) {
    Bytes png = {0x89, 'P', 'N', 'G', '\r', '\n', 0x1A, '\n'};
    Bytes ihdr;
    putBe32(ihdr, width);
    putBe32(ihdr, height);
    ihdr.insert(ihdr.end(), {8, 6, 0, 0, 0});
    appendChunk(png, "IHDR", ihdr);
    appendChunk(png, "IDAT", {0x78, 0x9C, 0x63, 0x00, 0x00, 0x00, 0x01, 0x00, 0x01});
    appendChunk(png, "IEND", {});
    return png;
}

}  // namespace

TEST(VcJpeg, EncodeMakesJpegRecordWithClampedQuality) {
    REQUIRE_GENERAL_CODECS();
    VCImage* image = makeRgba(64, 48);
    VCImage* jpeg = VCImage_encodeToJpeg(image, 90);
    ASSERT_NE(jpeg, nullptr);
    EXPECT_EQ(jpeg->format, 0x4745504Au);
    EXPECT_EQ(jpeg->width, 64);
    EXPECT_EQ(jpeg->height, 48);
    EXPECT_EQ(jpeg->wrapped, 0);
    EXPECT_EQ(jpeg->uvOffset, 0u);
    ASSERT_GT(jpeg->size, 100u);
    EXPECT_EQ(jpeg->data[0], 0xFF);
    EXPECT_EQ(jpeg->data[1], 0xD8);
    EXPECT_EQ(jpeg->data[jpeg->size - 2], 0xFF);
    EXPECT_EQ(jpeg->data[jpeg->size - 1], 0xD9);
    int w = 0, h = 0, subsampling = -1;
    Bytes decoded = turboDecode(bytesOf(jpeg), TJPF_RGBA, &w, &h, &subsampling);
    EXPECT_EQ(w, 64);
    EXPECT_EQ(h, 48);
    EXPECT_EQ(subsampling, TJSAMP_420);
    VCImage_destroy(jpeg);

    Bytes q85 = encodeBytes(image, 85);
    EXPECT_EQ(lumaDcQuantizer(q85), expectedDc(85));
    EXPECT_EQ(lumaDcQuantizer(encodeBytes(image, 100)), expectedDc(100));
    EXPECT_EQ(lumaDcQuantizer(encodeBytes(image, 1)), expectedDc(1));
    EXPECT_EQ(lumaDcQuantizer(encodeBytes(image, 50)), expectedDc(50));
    // Out-of-range qualities are 85, not clamped to the nearest end.
    EXPECT_EQ(encodeBytes(image, 0), q85);
    EXPECT_EQ(encodeBytes(image, 101), q85);
    EXPECT_EQ(encodeBytes(image, -7), q85);
    EXPECT_NE(encodeBytes(image, 100), q85);
    VCImage_destroy(image);
}

TEST(VcJpeg, DecodeRoundTripRgba) {
    REQUIRE_GENERAL_CODECS();
    VCImage* source = makeRgba(64, 48);
    Bytes jpeg = encodeBytes(source, 95);
    ASSERT_FALSE(jpeg.empty());
    int rc = 1;
    VCImage* image = decodeInto(VC_FORMAT_RGBA, jpeg, &rc);
    ASSERT_EQ(rc, 0);
    EXPECT_EQ(image->width, 64);
    EXPECT_EQ(image->height, 48);
    EXPECT_EQ(image->wrapped, 0);
    ASSERT_EQ(VCImage_size(image), 64u * 48 * 4);
    int w, h, s;
    Bytes reference = turboDecode(jpeg, TJPF_RGBA, &w, &h, &s);
    EXPECT_EQ(0, memcmp(image->data, reference.data(), reference.size()));
    EXPECT_LT(meanAbsDiff(image->data, 4, source->data, 4, 64 * 48, 3), 4.0);
    for (size_t i = 0; i < 64 * 48; ++i) ASSERT_EQ(image->data[i * 4 + 3], 255) << i;
    VCImage_destroy(image);
    VCImage_destroy(source);
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
    // and left as it was.
    LogCapture log;
    Bytes small(400, 0x5A);
    VCImage* tooSmall = VCImage_createWrap(small.data(), 10, 10, VC_FORMAT_RGBA, 400, 0);
    EXPECT_EQ(VCImage_decodeFromJpeg(tooSmall, jpeg.data(), length), VC_ERROR_INVALID_SIZE);
    EXPECT_EQ(tooSmall->width, 10);
    EXPECT_EQ(tooSmall->height, 10);
    EXPECT_EQ(small, Bytes(400, 0x5A));
    VCImage* sizeless = VCImage_createWrap(small.data(), 10, 10, VC_FORMAT_RGBA, 0, 0);
    EXPECT_EQ(VCImage_decodeFromJpeg(sizeless, jpeg.data(), length), VC_ERROR_INVALID_SIZE);
    EXPECT_EQ(sizeless->width, 10);
    EXPECT_EQ(small, Bytes(400, 0x5A));
    EXPECT_EQ(countErrors(log, "VC_ERROR_INVALID_SIZE", -4), 2);

    for (VCImage* i : {owned, wrapped, tooSmall, sizeless, source}) VCImage_destroy(i);
}

TEST(VcJpeg, DecodeIntoOtherFormats) {
    REQUIRE_GENERAL_CODECS();
    VCImage* source = makeRgba(64, 48);
    Bytes jpeg = encodeBytes(source, 90);
    int w, h, s;
    Bytes ref = turboDecode(jpeg, TJPF_RGBA, &w, &h, &s);
    const size_t n = 64 * 48;

    int rc = 1;
    VCImage* bgr = decodeInto(VC_FORMAT_BGR8, jpeg, &rc);
    ASSERT_EQ(rc, 0);
    ASSERT_EQ(VCImage_size(bgr), n * 3);
    for (size_t i = 0; i < n; ++i) {
        ASSERT_EQ(bgr->data[i * 3 + 0], ref[i * 4 + 2]) << i;
        ASSERT_EQ(bgr->data[i * 3 + 1], ref[i * 4 + 1]) << i;
        ASSERT_EQ(bgr->data[i * 3 + 2], ref[i * 4 + 0]) << i;
    }

    VCImage* nv21 = decodeInto(VC_FORMAT_NV21, jpeg, &rc);
    ASSERT_EQ(rc, 0);
    EXPECT_EQ(nv21->width, 64);
    EXPECT_EQ(nv21->height, 48);
    ASSERT_EQ(VCImage_size(nv21), n * 3 / 2);
    for (int y = 0; y < 48; ++y)
        for (int x = 0; x < 64; ++x) {
            int Y, U, V;
            rgbToYuv(&ref[(y * 64 + x) * 4], &Y, &U, &V);
            ASSERT_EQ(nv21->data[y * 64 + x], Y) << x << "," << y;
            if (x % 2 == 0 && y % 2 == 0) {
                const unsigned char* c = nv21->data + n + (y / 2) * 64 + x;
                ASSERT_EQ(c[0], V) << x << "," << y;
                ASSERT_EQ(c[1], U) << x << "," << y;
            }
        }

    // An odd-sized picture cannot become NV21: the record is left untouched.
    VCImage* odd = makeRgba(63, 48);
    Bytes oddJpeg = encodeBytes(odd, 90);
    VCImage* refused = decodeInto(VC_FORMAT_NV21, oddJpeg, &rc);
    EXPECT_EQ(rc, VC_ERROR_INVALID_SIZE);
    EXPECT_EQ(refused->data, nullptr);
    EXPECT_EQ(refused->width, 0);
    EXPECT_EQ(refused->height, 0);

    for (VCImage* i : {source, bgr, nv21, odd, refused}) VCImage_destroy(i);
}

TEST(VcJpeg, EncodesYuvPictures) {
    REQUIRE_GENERAL_CODECS();
    const int w = 64, h = 48;
    YuvPicture pic = makeYuv(w, h);
    Bytes rgb = yuvAsRgb(pic);
    size_t luma = static_cast<size_t>(w) * h;

    Bytes nv21 = layout420(pic, VC_FORMAT_NV21, luma);
    VCImage* image = VCImage_createWrap(nv21.data(), w, h, VC_FORMAT_NV21, 0, 0);
    Bytes fromNv21 = encodeBytes(image, 95);
    VCImage_destroy(image);
    ASSERT_FALSE(fromNv21.empty());
    int dw, dh, sub;
    Bytes decoded = turboDecode(fromNv21, TJPF_RGB, &dw, &dh, &sub);
    ASSERT_EQ(dw, w);
    EXPECT_EQ(sub, TJSAMP_420);
    EXPECT_LT(meanAbsDiff(decoded.data(), 3, rgb.data(), 3, luma, 3), 3.0);

    // The same samples in any 4:2:0 layout, or behind a displaced chroma
    // plane, make the very same stream.
    for (uint32_t format : {VC_FORMAT_NV12, VC_FORMAT_YV12, VC_FORMAT_YUVP}) {
        Bytes laid = layout420(pic, format, luma);
        VCImage* other = VCImage_createWrap(laid.data(), w, h, format, 0, 0);
        EXPECT_EQ(encodeBytes(other, 95), fromNv21) << std::string((const char*)&format, 4);
        VCImage_destroy(other);
    }
    Bytes padded = layout420(pic, VC_FORMAT_NV21, luma + 256);
    VCImage* displaced =
        VCImage_createWrap(padded.data(), w, h, VC_FORMAT_NV21, static_cast<int>(padded.size()),
                           static_cast<uint32_t>(luma + 256));
    EXPECT_EQ(encodeBytes(displaced, 95), fromNv21);
    VCImage_destroy(displaced);

    // Packed 4:2:2: chroma per horizontal pair (the first row of each pair of rows).
    for (uint32_t format : {VC_FORMAT_YUYV, VC_FORMAT_YVYU}) {
        Bytes packed(luma * 2);
        for (int y = 0; y < h; ++y)
            for (int x = 0; x < w; x += 2) {
                size_t c = (y / 2) * (w / 2) + x / 2;
                unsigned char* p = &packed[(y * w + x) * 2];
                p[0] = pic.y[y * w + x];
                p[2] = pic.y[y * w + x + 1];
                p[1] = format == VC_FORMAT_YUYV ? pic.u[c] : pic.v[c];
                p[3] = format == VC_FORMAT_YUYV ? pic.v[c] : pic.u[c];
            }
        VCImage* yuyv = VCImage_createWrap(packed.data(), w, h, format, 0, 0);
        Bytes stream = encodeBytes(yuyv, 95);
        VCImage_destroy(yuyv);
        Bytes back = turboDecode(stream, TJPF_RGB, &dw, &dh, &sub);
        ASSERT_EQ(back.size(), rgb.size());
        EXPECT_EQ(sub, TJSAMP_422);
        EXPECT_LT(meanAbsDiff(back.data(), 3, rgb.data(), 3, luma, 3), 3.0);
    }

    // Grey pictures make one-component streams.
    VCImage* grey = VCImage_createWrap(pic.y.data(), w, h, VC_FORMAT_GREY, 0, 0);
    Bytes greyStream = encodeBytes(grey, 95);
    VCImage_destroy(grey);
    Bytes greyBack = turboDecode(greyStream, TJPF_GRAY, &dw, &dh, &sub);
    EXPECT_EQ(sub, TJSAMP_GRAY);
    ASSERT_EQ(greyBack.size(), luma);
    EXPECT_LT(meanAbsDiff(greyBack.data(), 1, pic.y.data(), 1, luma, 1), 2.0);

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

TEST(VcJpeg, DecodeRejectsBadInput) {
    REQUIRE_GENERAL_CODECS();
    VCImage* source = makeRgba(32, 32);
    Bytes jpeg = encodeBytes(source, 90);
    VCImage_destroy(source);
    ASSERT_FALSE(jpeg.empty());
    LogCapture log;

    VCImage* image = VCImage_createEmpty(5, 5, VC_FORMAT_RGBA);
    EXPECT_EQ(VCImage_decodeFromJpeg(nullptr, jpeg.data(), 10), VC_ERROR_NULL_PARAM);
    EXPECT_EQ(VCImage_decodeFromJpeg(image, nullptr, 10), VC_ERROR_NULL_PARAM);
    EXPECT_EQ(VCImage_decodeFromJpeg(image, jpeg.data(), 0), VC_ERROR_NULL_PARAM);
    EXPECT_EQ(countErrors(log, "VC_ERROR_NULL_PARAM", -2), 3);
    EXPECT_EQ(VCImage_decodeFromJpeg(image, jpeg.data(), -3), VC_ERROR_INVALID_PARAM);

    Bytes truncated(jpeg.begin(), jpeg.begin() + jpeg.size() / 2);
    Bytes markerOnly = {0xFF, 0xD8};
    Bytes badTable = jpeg;
    size_t dqt = findMarker(badTable, 0xDB);
    ASSERT_NE(dqt, 0u);
    badTable[dqt + 2] = 0x07;  // table index out of range
    Bytes huge = jpeg;
    size_t sof = findMarker(huge, 0xC0);
    ASSERT_NE(sof, 0u);
    huge[sof + 3] = 0xFD;  // 65000 × 65000: no 32-bit size holds its pixels
    huge[sof + 4] = 0xE8;
    huge[sof + 5] = 0xFD;
    huge[sof + 6] = 0xE8;

    VCImage* pngSource = makeRgba(16, 16);
    PngPicture picture;
    picture.width = picture.height = 16;
    picture.samples.assign(pngSource->data, pngSource->data + 16 * 16 * 4);
    VCImage_destroy(pngSource);
    Bytes png = makePng(picture);
    Bytes pngTruncated(png.begin(), png.begin() + png.size() * 2 / 3);
    Bytes pngBadCrc = png;
    pngBadCrc[29] ^= 0x55;  // inside the header chunk's checksum

    const char garbage[] = "hello, this is not a picture";
    struct Case {
        const char* what;
        Bytes data;
    } cases[] = {
        {"garbage", Bytes(garbage, garbage + sizeof(garbage))},
        {"truncated JPEG", truncated},
        {"marker only", markerOnly},
        {"bad quantisation table", badTable},
        {"enormous JPEG", huge},
        {"truncated PNG", pngTruncated},
        {"PNG with a bad checksum", pngBadCrc},
        {"PNG of 50000x30000", pngDeclaring(50000, 30000)},
        {"PNG of 2000000x2", pngDeclaring(2000000, 2)},
    };
    for (const Case& c : cases) {
        log.clear();
        EXPECT_EQ(VCImage_decodeFromJpeg(image, c.data.data(), static_cast<int>(c.data.size())),
                  VC_ERROR_CODEC_FAILED)
            << c.what;
        EXPECT_EQ(log.lines().size(), 1u) << c.what;
        EXPECT_EQ(countErrors(log, "VC_ERROR_CODEC_FAILED", -9), 1) << c.what;
        EXPECT_EQ(image->data, nullptr) << c.what;
        EXPECT_EQ(image->width, 5) << c.what;
        EXPECT_EQ(image->height, 5) << c.what;
    }
    // The valid streams these were made from do decode.
    EXPECT_EQ(VCImage_decodeFromJpeg(image, png.data(), static_cast<int>(png.size())), 0);
    EXPECT_EQ(image->width, 16);
    VCImage_deallocate(image);
    EXPECT_EQ(VCImage_decodeFromJpeg(image, jpeg.data(), static_cast<int>(jpeg.size())), 0);
    EXPECT_EQ(image->width, 32);
    VCImage_destroy(image);
}

TEST(VcPng, DecodeKeepsColourOfTransparentPixels) {
    PngPicture picture;
    picture.width = 3;
    picture.height = 1;
    picture.samples = {200, 100, 50, 0, 10, 20, 30, 128, 1, 2, 3, 255};
    Bytes png = makePng(picture);
    int rc = 1;
    VCImage* image = decodeInto(VC_FORMAT_RGBA, png, &rc);
    ASSERT_EQ(rc, 0);
    ASSERT_EQ(image->width, 3);
    ASSERT_EQ(image->height, 1);
    EXPECT_EQ(Bytes(image->data, image->data + 12), picture.samples);
    VCImage_destroy(image);

    VCImage* bgra = decodeInto(VC_FORMAT_BGRA, png, &rc);
    ASSERT_EQ(rc, 0);
    EXPECT_EQ(Bytes(bgra->data, bgra->data + 12),
              Bytes({50, 100, 200, 0, 30, 20, 10, 128, 3, 2, 1, 255}));
    VCImage_destroy(bgra);
}

TEST(VcPng, DecodesEveryColourType) {
    struct Case {
        const char* what;
        PngPicture picture;
        Bytes rgba;
    };
    std::vector<Case> cases;
    {
        PngPicture s;
        s.width = 2;
        s.colorType = PNG_COLOR_TYPE_GRAY;
        s.samples = {7, 250};
        cases.push_back({"grey", s, {7, 7, 7, 255, 250, 250, 250, 255}});
    }
    {
        PngPicture s;
        s.width = 3;
        s.colorType = PNG_COLOR_TYPE_GRAY;
        s.bitDepth = 1;
        s.samples = {0xA0};  // 1, 0, 1
        cases.push_back({"1-bit grey", s, {255, 255, 255, 255, 0, 0, 0, 255, 255, 255, 255, 255}});
    }
    {
        PngPicture s;
        s.width = 1;
        s.colorType = PNG_COLOR_TYPE_GRAY_ALPHA;
        s.samples = {90, 0};
        cases.push_back({"grey and alpha", s, {90, 90, 90, 0}});
    }
    {
        PngPicture s;
        s.width = 1;
        s.colorType = PNG_COLOR_TYPE_RGB;
        s.samples = {1, 2, 3};
        cases.push_back({"RGB", s, {1, 2, 3, 255}});
    }
    {
        PngPicture s;
        s.width = 1;
        s.colorType = PNG_COLOR_TYPE_RGB;
        s.bitDepth = 16;
        s.samples = {0x80, 0x80, 0x40, 0x40, 0xFF, 0xFF};
        cases.push_back({"16-bit RGB", s, {0x80, 0x40, 0xFF, 255}});
    }
    {
        PngPicture s;
        s.width = 3;
        s.colorType = PNG_COLOR_TYPE_PALETTE;
        s.palette = {{10, 20, 30}, {40, 50, 60}, {70, 80, 90}};
        s.paletteAlpha = {0, 77};
        s.samples = {2, 0, 1};
        cases.push_back({"palette", s, {70, 80, 90, 255, 10, 20, 30, 0, 40, 50, 60, 77}});
    }
    {
        // Interlaced: the same pixels as written row by row.
        PngPicture s;
        s.width = 9;
        s.height = 7;
        s.interlaced = true;
        s.samples.resize(9 * 7 * 4);
        for (int y = 0; y < 7; ++y)
            for (int x = 0; x < 9; ++x) gradientPixel(x, y, 9, 7, &s.samples[(y * 9 + x) * 4]);
        cases.push_back({"interlaced", s, s.samples});
    }
    for (const Case& c : cases) {
        Bytes png = makePng(c.picture);
        int rc = 1;
        VCImage* image = decodeInto(VC_FORMAT_RGBA, png, &rc);
        ASSERT_EQ(rc, 0) << c.what;
        EXPECT_EQ(image->width, c.picture.width) << c.what;
        EXPECT_EQ(image->height, c.picture.height) << c.what;
        EXPECT_EQ(Bytes(image->data, image->data + VCImage_size(image)), c.rgba) << c.what;
        VCImage_destroy(image);
    }
}
