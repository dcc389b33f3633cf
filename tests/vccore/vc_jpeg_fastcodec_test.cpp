// JPEG coding through the platform's fast codec, played by the stand-in
// library of jpeg_standin/ (its "stream" is a header followed by raw pixels).
// ctest runs this suite a second time with the stand-in on the library path;
// without it the cases skip, unless KIV_EXPECT_FAST_JPEG says it must be there.
#include <gtest/gtest.h>
#include <stdlib.h>
#include <string.h>
#include <turbojpeg.h>

#include <fstream>

#include "jpeg_standin/jpeg_standin.h"
#include "jpeg_standin/jpeg_test_util.h"
#include "support/log_capture.h"
#include "vccore/vc_file.h"
#include "vccore/vc_log.h"

using namespace jpegtest;

namespace {

#define REQUIRE_FAST_CODEC()                                                      \
    do {                                                                          \
        if (!fastCodecInstalled()) {                                              \
            if (getenv("KIV_EXPECT_FAST_JPEG") != nullptr)                        \
                FAIL() << "libkivjpeginterface.so should be on the library path"; \
            GTEST_SKIP() << "libkivjpeginterface.so is not on the library path";  \
        }                                                                         \
    } while (0)

// The codec is opened per call and closed after it.
bool codecMapped() {
    std::ifstream maps("/proc/self/maps");
    std::string line;
    while (std::getline(maps, line))
        if (line.find("libkivjpeginterface") != std::string::npos) return true;
    return false;
}

JpegStandinHeader headerOf(const unsigned char* stream) {
    JpegStandinHeader header;
    memcpy(&header, stream, sizeof(header));
    return header;
}

}  // namespace

TEST(VcJpegFastCodec, EncodeGoesThroughFastCodec) {
    REQUIRE_FAST_CODEC();
    VCImage* image = makeRgba(8, 6);
    VCImage* jpeg = VCImage_encodeToJpeg(image, 0);
    ASSERT_NE(jpeg, nullptr);
    EXPECT_FALSE(codecMapped());
    EXPECT_EQ(jpeg->format, VC_FORMAT_JPEG);
    EXPECT_EQ(shapeOf(jpeg), "8x6");
    EXPECT_EQ(jpeg->wrapped, 0);
    ASSERT_EQ(jpeg->size, sizeof(JpegStandinHeader) + 8 * 6 * 4);
    JpegStandinHeader header = headerOf(jpeg->data);
    EXPECT_EQ(memcmp(header.magic, JPEG_STANDIN_MAGIC, 6), 0);
    EXPECT_EQ(header.width, 8);
    EXPECT_EQ(header.height, 6);
    EXPECT_EQ(header.format, VC_FORMAT_RGBA);
    EXPECT_EQ(header.quality, 85);
    EXPECT_EQ(header.size, 8u * 6 * 4);
    EXPECT_EQ(Bytes(jpeg->data + sizeof(header), jpeg->data + jpeg->size), bytesOf(image));
    VCImage_destroy(jpeg);

    for (int quality : {1, 100, 101, -1}) {
        jpeg = VCImage_encodeToJpeg(image, quality);
        ASSERT_NE(jpeg, nullptr);
        EXPECT_EQ(headerOf(jpeg->data).quality, quality >= 1 && quality <= 100 ? quality : 85);
        VCImage_destroy(jpeg);
    }

    // The codec is told the computed size when the size field is 0.
    Bytes nv21(8 * 6 * 3 / 2, 0x33);
    VCImage* yuv = VCImage_createWrap(nv21.data(), 8, 6, VC_FORMAT_NV21, 0, 0);
    jpeg = VCImage_encodeToJpeg(yuv, 90);
    ASSERT_NE(jpeg, nullptr);
    EXPECT_EQ(headerOf(jpeg->data).size, 72u);
    EXPECT_EQ(headerOf(jpeg->data).format, VC_FORMAT_NV21);
    VCImage_destroy(jpeg);

    // A picture the codec refuses is a failure, not a detour to another encoder.
    LogCapture log;
    Bytes bgr(8 * 6 * 3, 0x44);
    VCImage* refused = VCImage_createWrap(bgr.data(), 8, 6, VC_FORMAT_BGR8, 0, 0);
    EXPECT_EQ(VCImage_encodeToJpeg(refused, 90), nullptr);
    ASSERT_EQ(log.lines().size(), 1u);
    EXPECT_EQ(log.lines()[0].level, VF_LOG_ERROR);
    EXPECT_EQ(log.lines()[0].text, "Encoding failed (8x6 BGR8)");
    EXPECT_FALSE(codecMapped());
    for (VCImage* i : {image, yuv, refused}) VCImage_destroy(i);
}

TEST(VcJpegFastCodec, DecodeTakesFastCodecPixels) {
    REQUIRE_FAST_CODEC();
    VCImage* image = makeRgba(8, 6);
    VCImage* stream = VCImage_encodeToJpeg(image, 90);
    ASSERT_NE(stream, nullptr);
    const int length = static_cast<int>(stream->size);

    // The codec's pixels replace the buffer; a wrapped one is left to its owner.
    Bytes caller(16, 0x77);
    VCImage* wrapped = VCImage_createWrap(caller.data(), 2, 2, VC_FORMAT_RGBA, 16, 0);
    ASSERT_EQ(VCImage_decodeFromJpeg(wrapped, stream->data, length), 0);
    EXPECT_FALSE(codecMapped());
    EXPECT_NE(wrapped->data, caller.data());
    EXPECT_EQ(wrapped->wrapped, 0);
    EXPECT_EQ(wrapped->size, 0u);
    EXPECT_EQ(shapeOf(wrapped), "8x6");
    EXPECT_EQ(bytesOf(wrapped), bytesOf(image));
    EXPECT_EQ(caller, Bytes(16, 0x77));
    // An owned buffer is freed on the way (the sanitizer run checks the leak).
    ASSERT_EQ(VCImage_decodeFromJpeg(wrapped, stream->data, length), 0);
    EXPECT_EQ(bytesOf(wrapped), bytesOf(image));

    LogCapture log;
    // A record without a format never reaches the fast codec, and the general
    // decoder cannot read the stand-in's stream; neither can it for a format
    // the codec refuses.
    VCImage* noFormat = VCImage_createEmpty(0, 0, 0);
    EXPECT_EQ(VCImage_decodeFromJpeg(noFormat, stream->data, length), VC_ERROR_CODEC_FAILED);
    VCImage* bgr = VCImage_createEmpty(0, 0, VC_FORMAT_BGR8);
    EXPECT_EQ(VCImage_decodeFromJpeg(bgr, stream->data, length), VC_ERROR_CODEC_FAILED);
    EXPECT_EQ(bgr->data, nullptr);
    EXPECT_EQ(countErrors(log, "VC_ERROR_CODEC_FAILED", -9), 2);

    // A real JPEG the codec does not take falls back to the general decoder.
    tjhandle tj = tjInitCompress();
    unsigned char* real = nullptr;
    unsigned long realSize = 0;
    ASSERT_EQ(tjCompress2(tj, image->data, 8, 0, 6, TJPF_RGBA, &real, &realSize, TJSAMP_444, 95, 0),
              0);
    tjDestroy(tj);
    VCImage* general = VCImage_createEmpty(0, 0, VC_FORMAT_RGBA);
    EXPECT_EQ(VCImage_decodeFromJpeg(general, real, static_cast<int>(realSize)), 0);
    EXPECT_EQ(shapeOf(general), "8x6");
    EXPECT_EQ(general->size, 8u * 6 * 4);
    tjFree(real);
    EXPECT_FALSE(codecMapped());

    for (VCImage* i : {image, stream, wrapped, noFormat, bgr, general}) VCImage_destroy(i);
}

TEST(VcJpegFastCodec, SaveAndLoadThroughFastCodec) {
    REQUIRE_FAST_CODEC();
    TempDir dir;
    VCImage* image = makeRgba(8, 6);
    std::string path = dir.file("picture.jpg");
    ASSERT_EQ(VCImage_saveToFile(image, path.c_str(), 77), 0);
    Bytes file = readFile(path);
    ASSERT_EQ(file.size(), sizeof(JpegStandinHeader) + 8 * 6 * 4);
    EXPECT_EQ(headerOf(file.data()).quality, 77);

    VCImage* loaded = VCImage_createEmpty(0, 0, VC_FORMAT_RGBA);
    ASSERT_EQ(VCImage_loadFromFile(loaded, path.c_str()), 0);
    EXPECT_EQ(shapeOf(loaded), "8x6");
    EXPECT_EQ(bytesOf(loaded), bytesOf(image));
    VCImage_destroy(loaded);
    VCImage_destroy(image);
}
