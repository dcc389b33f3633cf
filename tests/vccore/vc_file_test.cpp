// Image files: saving by extension, loading with the raw fall-back, and the
// byte-block writer and file-size helpers.
#include <gtest/gtest.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cmath>

#include "jpeg_standin/jpeg_test_util.h"
#include "vccore/vc_file.h"
#include "vccore/vc_picture.h"

using namespace jpegtest;

namespace {

Bytes text(const char* s) {
    return Bytes(s, s + strlen(s));
}

ImagePtr load(const std::string& path, uint32_t format = VC_FORMAT_RGBA, int* status = nullptr) {
    ImagePtr image(VCImage_createEmpty(0, 0, format));
    const int rc = VCImage_loadFromFile(image.get(), path.c_str());
    if (status != nullptr) *status = rc;
    return image;
}

TEST(VcFile, SaveToFileWritesWithoutTruncatingAndFsizeRestoresPosition) {
    TempDir dir;
    const std::string path = dir.file("block.bin");
    save_to_file(path.c_str(), text("hello").data(), 5);
    EXPECT_EQ(readFile(path), text("hello"));
    // A longer existing file keeps its tail.
    writeFile(path, text("0123456789"));
    save_to_file(path.c_str(), text("abc").data(), 3);
    EXPECT_EQ(readFile(path), text("abc3456789"));
    // New files get every permission bit the umask lets through, even empty.
    mode_t old = umask(0);
    save_to_file(dir.file("fresh.bin").c_str(), text("x").data(), 0);
    umask(old);
    struct stat info;
    ASSERT_EQ(stat(dir.file("fresh.bin").c_str(), &info), 0);
    EXPECT_EQ(info.st_mode & 0777, 0777u);
    EXPECT_EQ(0, info.st_size);

    FILE* f = fopen(path.c_str(), "rb");
    ASSERT_EQ(fseek(f, 4, SEEK_SET), 0);
    EXPECT_EQ(fsize(f), 10);
    EXPECT_EQ(ftell(f), 4);
    fclose(f);
    int fds[2];
    ASSERT_EQ(pipe(fds), 0);
    FILE* stream = fdopen(fds[0], "r");
    EXPECT_EQ(fsize(stream), -1);
    fclose(stream);
    close(fds[1]);
    EXPECT_EQ(fsize(nullptr), -1);
}

TEST(VcFile, SaveChoosesFormatByExtension) {
    if (fastCodecInstalled()) GTEST_SKIP() << "the fast codec is installed here";
    TempDir dir;
    ImagePtr image = makeRgba(32, 24);
    ImagePtr jpeg85(VCImage_encodeToJpeg(image.get(), 85));
    ASSERT_NE(jpeg85, nullptr);
    // Quality 0 is 85, as for encoding; ".jpg" or ".jpeg" anywhere, in any case,
    // before ".png" anywhere; anything else is the raw buffer, as long as the
    // size field says.
    Bytes pixels(100, 3);
    ImagePtr sizeless = VCImageTest_wrap(pixels.data(), 5, 5, VC_FORMAT_RGBA);
    ImagePtr half = VCImageTest_wrap(pixels.data(), 5, 5, VC_FORMAT_RGBA, 50);
    const struct {
        const VCImage* image;
        const char* name;
        int quality;
        Bytes content;  // empty: a PNG of the image
    } rows[] = {
        {image.get(), "picture.JPG", 0, VCImageTest_bytes(*jpeg85)},
        {image.get(), "x.Jpeg.png", 85, VCImageTest_bytes(*jpeg85)},
        {image.get(), "shot.jpg.png", 85, VCImageTest_bytes(*jpeg85)},
        {image.get(), "a.png.bin", 85, {}},
        {image.get(), "frame.yuv", 85, VCImageTest_bytes(*image)},
        {sizeless.get(), "sizeless.raw", 85, {}},
        {half.get(), "half.raw", 85, Bytes(50, 3)},
    };
    for (const auto& r : rows) {
        ASSERT_EQ(0, VCImage_saveToFile(r.image, dir.file(r.name).c_str(), r.quality)) << r.name;
        if (r.image == image.get() && r.content.empty()) {
            EXPECT_EQ(VCImageTest_bytes(*image), VCImageTest_bytes(*load(dir.file(r.name))));
        } else {
            EXPECT_EQ(r.content, readFile(dir.file(r.name))) << r.name;
            EXPECT_TRUE(fileExists(dir.file(r.name))) << r.name;
        }
    }
    // A JPEG that cannot be encoded is only logged; nothing is written.
    ImagePtr odd = VCImageTest_wrap(pixels.data(), 5, 5, VC_FOURCC('A', 'B', 'C', 'D'), 100);
    EXPECT_EQ(0, VCImage_saveToFile(odd.get(), dir.file("bad.jpg").c_str(), 85));
    EXPECT_FALSE(fileExists(dir.file("bad.jpg")));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_saveToFile(nullptr, dir.file("n.jpg").c_str(), 85));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_saveToFile(image.get(), nullptr, 85));
}

TEST(VcFile, PngSaveStoresStraightAlpha) {
    TempDir dir;
    // Premultiplied input: colour <= alpha, but the last pixel, which is out
    // of range and must saturate.
    Bytes premultiplied = {100, 50, 0, 128, 10, 20, 30, 0, 255, 128, 1, 255, 200, 10, 0, 100};
    ImagePtr image = VCImageTest_wrap(premultiplied.data(), 4, 1, VC_FORMAT_RGBA, 16);
    ASSERT_EQ(0, VCImage_saveToFile(image.get(), dir.file("alpha.png").c_str(), 85));
    Bytes want = premultiplied;
    for (int i = 0; i < 16; ++i) {
        const int a = premultiplied[i / 4 * 4 + 3];
        if (i % 4 != 3)
            want[i] = a == 0 ? 0 : std::min(255L, std::lround(premultiplied[i] * 255.0 / a));
    }
    EXPECT_EQ(want, VCImageTest_bytes(*load(dir.file("alpha.png"))));
    // The encoder of our own keeps straight alpha as it is, RGBA only.
    size_t length = 0;
    unsigned char* stream = VCPicture_encodePng(image.get(), &length);
    ASSERT_NE(stream, nullptr);
    int rc = 1;
    ImagePtr back(VCImage_createEmpty(0, 0, VC_FORMAT_RGBA));
    rc = VCImage_decodeFromJpeg(back.get(), stream, length);
    free(stream);
    ASSERT_EQ(0, rc);
    EXPECT_EQ(premultiplied, VCImageTest_bytes(*back));
    EXPECT_EQ(nullptr,
              VCPicture_encodePng(
                  VCImageTest_wrap(premultiplied.data(), 4, 2, VC_FORMAT_RGBA, 16).get(), &length));
    EXPECT_EQ(nullptr,
              VCPicture_encodePng(
                  VCImageTest_wrap(premultiplied.data(), 4, 1, VC_FORMAT_BGRA, 16).get(), &length));
    EXPECT_EQ(nullptr, VCPicture_encodePng(nullptr, &length));

    // Other formats go through an RGBA copy.
    Bytes bgr = {1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15, 16, 17, 18};
    ASSERT_EQ(0, VCImage_saveToFile(VCImageTest_wrap(bgr.data(), 3, 2, VC_FORMAT_BGR8, 18).get(),
                                    dir.file("bgr.png").c_str(), 85));
    EXPECT_EQ(Bytes({3,  2,  1,  255, 6,  5,  4,  255, 9,  8,  7,  255,
                     12, 11, 10, 255, 15, 14, 13, 255, 18, 17, 16, 255}),
              VCImageTest_bytes(*load(dir.file("bgr.png"))));
    // No RGBA copy possible, no pixels, a file not creatable, a short buffer.
    Bytes yuv(18, 0);
    ImagePtr rgba = makeRgba(4, 4);
    const struct {
        ImagePtr image;
        const char* name;
        int status;
    } failures[] = {
        {VCImageTest_wrap(yuv.data(), 3, 3, VC_FORMAT_NV21, 14), "odd.png", VC_ERROR_UNKNOWN},
        {ImagePtr(VCImage_createEmpty(4, 4, VC_FORMAT_RGBA)), "none.png", VC_ERROR_UNKNOWN},
        {VCImageTest_wrap(rgba->data, 4, 4, VC_FORMAT_RGBA), "missing/x.png", VC_ERROR_UNKNOWN},
        {VCImageTest_wrap(rgba->data, 4, 4, VC_FORMAT_RGBA, 60), "short.png",
         VC_ERROR_INVALID_SIZE},
    };
    for (const auto& f : failures) {
        EXPECT_EQ(f.status, VCImage_saveToFile(f.image.get(), dir.file(f.name).c_str(), 85))
            << f.name;
        EXPECT_FALSE(fileExists(dir.file(f.name))) << f.name;  // no broken picture left
    }
}

TEST(VcFile, LoadFromFile) {
    TempDir dir;
    ImagePtr image = makeRgba(40, 30);
    ASSERT_EQ(0, VCImage_saveToFile(image.get(), dir.file("in.png").c_str(), 85));
    ImagePtr loaded = load(dir.file("in.png"));
    EXPECT_EQ("40x30 RGBA", VCImageTest_record(loaded.get()).substr(0, 10));
    EXPECT_EQ(VCImageTest_bytes(*image), VCImageTest_bytes(*loaded));
    if (!fastCodecInstalled()) {
        ASSERT_EQ(0, VCImage_saveToFile(image.get(), dir.file("in.jpg").c_str(), 90));
        Bytes jpeg = readFile(dir.file("in.jpg"));
        ImagePtr direct(VCImage_createEmpty(0, 0, VC_FORMAT_NV21));
        ASSERT_EQ(0, VCImage_decodeFromJpeg(direct.get(), jpeg.data(), jpeg.size()));
        EXPECT_EQ(VCImageTest_bytes(*direct),
                  VCImageTest_bytes(*load(dir.file("in.jpg"), VC_FORMAT_NV21)));
        // A picture that decodes but cannot become NV21 (odd width) leaves the
        // record as it was, and so does a header promising 3.6 GB of pixels:
        // neither is then taken for raw pixels of its own geometry.
        ImagePtr oddRgba = makeRgba(63, 48);
        ASSERT_EQ(0, VCImage_saveToFile(oddRgba.get(), dir.file("odd.jpg").c_str(), 90));
        writeFile(dir.file("bomb.jpg"), jpegDeclaring(readFile(dir.file("odd.jpg")), 30000, 30000));
        for (auto c : {std::make_pair("odd.jpg", VC_FORMAT_NV21), {"bomb.jpg", VC_FORMAT_RGBA}}) {
            int rc = 0;
            ImagePtr target = load(dir.file(c.first), c.second, &rc);
            EXPECT_EQ(VC_ERROR_INVALID_SIZE, rc) << c.first;
            EXPECT_EQ("0x0", VCImageTest_record(target.get()).substr(0, 3)) << c.first;
            EXPECT_EQ(nullptr, target->data) << c.first;
        }
    }
    // Raw NV21 bytes into an image that already knows its geometry; the file
    // buffer replaces the buffer it had, whatever its length.
    Bytes raw = VCImageTest_randomBytes(640 * 480 * 3 / 2, 7);
    writeFile(dir.file("frame.nv21"), raw);
    writeFile(dir.file("short.nv21"), Bytes(1000, 9));
    ImagePtr nv21(VCImage_createNew(640, 480, VC_FORMAT_NV21));
    ASSERT_EQ(0, VCImage_loadFromFile(nv21.get(), dir.file("frame.nv21").c_str()));
    EXPECT_EQ("640x480 NV21 wrapped 0 size 460800 uv 0", VCImageTest_record(nv21.get()));
    EXPECT_EQ(raw, VCImageTest_bytes(*nv21));
    ASSERT_EQ(0, VCImage_loadFromFile(nv21.get(), dir.file("short.nv21").c_str()));
    EXPECT_EQ(Bytes(1000, 9), VCImageTest_bytes(*nv21));
    // Failures and their reasons.
    writeFile(dir.file("empty.jpg"), Bytes());
    writeFile(dir.file("garbage.jpg"), text("not a picture at all"));
    const struct {
        std::string path;
        int status;
        VCDecodeFailure why;
    } failures[] = {
        {dir.file("empty.jpg"), VC_ERROR_IO_FAILED, VC_DECODE_READ_FAILED},
        {dir.file("absent.jpg"), VC_ERROR_IO_FAILED, VC_DECODE_READ_FAILED},
        {dir.path(), VC_ERROR_IO_FAILED, VC_DECODE_READ_FAILED},
        {dir.file("garbage.jpg"), VC_ERROR_CODEC_FAILED, VC_DECODE_NOT_A_PICTURE},
    };
    for (const auto& f : failures) {
        int rc = 0;
        ImagePtr target = load(f.path, VC_FORMAT_RGBA, &rc);
        EXPECT_EQ(f.status, rc) << f.path;
        EXPECT_EQ(f.why, VCPicture_lastFailure()) << f.path;
        EXPECT_EQ(nullptr, target->data) << f.path;
    }
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_loadFromFile(nullptr, dir.file("in.png").c_str()));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, VCImage_loadFromFile(image.get(), nullptr));
}

}  // namespace
