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
#include "vccore/vc_file.h"
#include "vccore/vc_log.h"

using namespace jpegtest;

namespace {

class VcJpegFastCodec : public ::testing::Test {
protected:
    void SetUp() override {
        if (fastCodecInstalled()) return;
        if (getenv("KIV_EXPECT_FAST_JPEG") != nullptr)
            FAIL() << "libkivjpeginterface.so should be on the library path";
        GTEST_SKIP() << "libkivjpeginterface.so is not on the library path";
    }
    // The codec is opened per call and closed after it.
    void TearDown() override {
        std::ifstream maps("/proc/self/maps");
        std::string line;
        while (std::getline(maps, line))
            EXPECT_EQ(std::string::npos, line.find("libkivjpeginterface")) << "still mapped";
    }
};

JpegStandinHeader headerOf(const unsigned char* stream) {
    JpegStandinHeader header;
    memcpy(&header, stream, sizeof(header));
    return header;
}

TEST_F(VcJpegFastCodec, EncodeGoesThroughTheFastCodec) {
    ImagePtr image = makeRgba(8, 6);
    ImagePtr jpeg(VCImage_encodeToJpeg(image.get(), 0));
    ASSERT_NE(jpeg, nullptr);
    EXPECT_EQ("8x6 JPEG wrapped 0 size 220 uv 0", VCImageTest_record(jpeg.get()));
    JpegStandinHeader header = headerOf(jpeg->data);
    EXPECT_EQ(memcmp(header.magic, JPEG_STANDIN_MAGIC, 6), 0);
    EXPECT_EQ(std::vector<int>({8, 6, 85, 8 * 6 * 4}),
              std::vector<int>({header.width, header.height, header.quality, int(header.size)}));
    EXPECT_EQ(header.format, VC_FORMAT_RGBA);
    EXPECT_EQ(Bytes(jpeg->data + sizeof(header), jpeg->data + jpeg->size),
              VCImageTest_bytes(*image));
    for (int quality : {1, 100, 101, -1}) {
        jpeg.reset(VCImage_encodeToJpeg(image.get(), quality));
        ASSERT_NE(jpeg, nullptr);
        EXPECT_EQ(headerOf(jpeg->data).quality, quality >= 1 && quality <= 100 ? quality : 85);
    }
    // The codec is told the computed size when the size field is 0.
    Bytes nv21(72, 0x33);
    jpeg.reset(VCImage_encodeToJpeg(VCImageTest_wrap(nv21.data(), 8, 6, VC_FORMAT_NV21).get(), 90));
    ASSERT_NE(jpeg, nullptr);
    EXPECT_EQ(headerOf(jpeg->data).size, 72u);
    EXPECT_EQ(headerOf(jpeg->data).format, VC_FORMAT_NV21);
    // A picture the codec refuses is a failure, not a detour to another encoder.
    Bytes bgr(8 * 6 * 3, 0x44);
    LogCapture log;
    EXPECT_EQ(nullptr,
              VCImage_encodeToJpeg(VCImageTest_wrap(bgr.data(), 8, 6, VC_FORMAT_BGR8).get(), 90));
    EXPECT_TRUE(log.matches({"E Encoding failed (8x6 BGR8)"}));
}

TEST_F(VcJpegFastCodec, DecodeTakesTheFastCodecsPixels) {
    ImagePtr image = makeRgba(8, 6);
    ImagePtr stream(VCImage_encodeToJpeg(image.get(), 90));
    ASSERT_NE(stream, nullptr);
    // The codec's pixels replace the buffer; a wrapped one is left to its
    // owner, an owned one freed on the way (the sanitizer run checks the leak).
    Bytes caller(16, 0x77);
    ImagePtr wrapped = VCImageTest_wrap(caller.data(), 2, 2, VC_FORMAT_RGBA, 16);
    for (int round = 0; round < 2; ++round) {
        ASSERT_EQ(0, VCImage_decodeFromJpeg(wrapped.get(), stream->data, stream->size));
        EXPECT_EQ("8x6 RGBA wrapped 0 size 0 uv 0", VCImageTest_record(wrapped.get()));
        EXPECT_EQ(VCImageTest_bytes(*image), VCImageTest_bytes(*wrapped));
    }
    EXPECT_EQ(caller, Bytes(16, 0x77));
    // A record without a format never reaches the fast codec, and the general
    // decoder cannot read the stand-in's stream; neither for a format the codec refuses.
    for (uint32_t format : {0u, VC_FORMAT_BGR8}) {
        ImagePtr refused(VCImage_createEmpty(0, 0, format));
        EXPECT_EQ(VC_ERROR_CODEC_FAILED,
                  VCImage_decodeFromJpeg(refused.get(), stream->data, stream->size));
        EXPECT_EQ(nullptr, refused->data);
    }
    // A real JPEG the codec does not take falls back to the general decoder.
    tjhandle tj = tjInitCompress();
    unsigned char* real = nullptr;
    unsigned long realSize = 0;
    ASSERT_EQ(
        0, tjCompress2(tj, image->data, 8, 0, 6, TJPF_RGBA, &real, &realSize, TJSAMP_444, 95, 0));
    tjDestroy(tj);
    ImagePtr general(VCImage_createEmpty(0, 0, VC_FORMAT_RGBA));
    EXPECT_EQ(0, VCImage_decodeFromJpeg(general.get(), real, realSize));
    tjFree(real);
    EXPECT_EQ("8x6 RGBA wrapped 0 size 192 uv 0", VCImageTest_record(general.get()));
}

TEST_F(VcJpegFastCodec, SaveAndLoadThroughTheFastCodec) {
    TempDir dir;
    ImagePtr image = makeRgba(8, 6);
    const std::string path = dir.file("picture.jpg");
    ASSERT_EQ(0, VCImage_saveToFile(image.get(), path.c_str(), 77));
    Bytes file = readFile(path);
    ASSERT_EQ(file.size(), sizeof(JpegStandinHeader) + 8 * 6 * 4);
    EXPECT_EQ(headerOf(file.data()).quality, 77);
    ImagePtr loaded(VCImage_createEmpty(0, 0, VC_FORMAT_RGBA));
    ASSERT_EQ(0, VCImage_loadFromFile(loaded.get(), path.c_str()));
    EXPECT_EQ(VCImageTest_bytes(*image), VCImageTest_bytes(*loaded));
}

}  // namespace
