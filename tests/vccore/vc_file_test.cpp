// Image files: saving by extension, loading with the raw fall-back, and the
// byte-block writer and file-size helpers.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cmath>

#include "jpeg_standin/jpeg_test_util.h"
#include "support/log_capture.h"
#include "vccore/vc_file.h"
#include "vccore/vc_log.h"
#include "vccore/vc_picture.h"

using namespace jpegtest;

namespace {

bool isPng(const Bytes& b) {
    return b.size() > 8 && memcmp(b.data(), "\x89PNG\r\n\x1A\n", 8) == 0;
}
bool isJpeg(const Bytes& b) {
    return b.size() > 2 && b[0] == 0xFF && b[1] == 0xD8;
}

Bytes text(const char* s) {
    return Bytes(s, s + strlen(s));
}

using Lines = std::vector<std::pair<int, std::string>>;
Lines linesOf(const LogCapture& log) {
    Lines out;
    for (const LoggedLine& l : log.lines()) out.emplace_back(l.level, l.text);
    return out;
}

}  // namespace

TEST(VcFile, SaveToFileWritesWithoutTruncating) {
    TempDir dir;
    LogCapture log;
    std::string path = dir.file("block.bin");
    save_to_file(path.c_str(), text("hello").data(), 5);
    EXPECT_EQ(readFile(path), text("hello"));
    EXPECT_EQ(linesOf(log), (Lines{{VF_LOG_DEBUG, "opening file"},
                                   {VF_LOG_DEBUG, "done writing to file in 1 passes\n"}}));

    // A longer existing file keeps its tail.
    writeFile(path, text("0123456789"));
    save_to_file(path.c_str(), text("abc").data(), 3);
    EXPECT_EQ(readFile(path), text("abc3456789"));

    // New files get every permission bit the umask lets through.
    mode_t old = umask(0);
    std::string fresh = dir.file("fresh.bin");
    save_to_file(fresh.c_str(), text("x").data(), 1);
    umask(old);
    struct stat info;
    ASSERT_EQ(stat(fresh.c_str(), &info), 0);
    EXPECT_EQ(info.st_mode & 0777, 0777u);

    log.clear();
    std::string empty = dir.file("empty.bin");
    save_to_file(empty.c_str(), text("x").data(), 0);
    EXPECT_TRUE(fileExists(empty));
    EXPECT_EQ(linesOf(log), (Lines{{VF_LOG_DEBUG, "opening file"},
                                   {VF_LOG_DEBUG, "done writing to file in 0 passes\n"}}));

    log.clear();
    save_to_file(dir.file("missing/dir.bin").c_str(), text("x").data(), 1);
    EXPECT_EQ(linesOf(log),
              (Lines{{VF_LOG_DEBUG, "opening file"},
                     {VF_LOG_ERROR, "failed to create file: No such file or directory"}}));

    log.clear();
    save_to_file("/dev/full", text("data").data(), 4);
    EXPECT_EQ(linesOf(log),
              (Lines{{VF_LOG_DEBUG, "opening file"},
                     {VF_LOG_ERROR, "failed to write to file: No space left on device"},
                     {VF_LOG_DEBUG, "done writing to file in 1 passes\n"}}));
}

TEST(VcFile, FsizeRestoresPosition) {
    FILE* f = tmpfile();
    ASSERT_NE(f, nullptr);
    Bytes data(123, 7);
    ASSERT_EQ(fwrite(data.data(), 1, data.size(), f), data.size());
    ASSERT_EQ(fseek(f, 10, SEEK_SET), 0);
    EXPECT_EQ(fsize(f), 123);
    EXPECT_EQ(ftell(f), 10);
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
    VCImage* image = makeRgba(32, 24);
    VCImage* jpeg85 = VCImage_encodeToJpeg(image, 85);
    ASSERT_NE(jpeg85, nullptr);
    Bytes expectedJpeg = bytesOf(jpeg85);
    VCImage_destroy(jpeg85);

    // Quality 0 is 85, as for encoding.
    EXPECT_EQ(VCImage_saveToFile(image, dir.file("picture.JPG").c_str(), 0), 0);
    EXPECT_EQ(readFile(dir.file("picture.JPG")), expectedJpeg);
    EXPECT_EQ(VCImage_saveToFile(image, dir.file("x.Jpeg.png").c_str(), 85), 0);
    EXPECT_EQ(readFile(dir.file("x.Jpeg.png")), expectedJpeg);
    EXPECT_EQ(VCImage_saveToFile(image, dir.file("shot.jpg.png").c_str(), 85), 0);
    EXPECT_TRUE(isJpeg(readFile(dir.file("shot.jpg.png"))));

    // Substring test: ".png" anywhere.
    EXPECT_EQ(VCImage_saveToFile(image, dir.file("a.png.bin").c_str(), 85), 0);
    Bytes png = readFile(dir.file("a.png.bin"));
    ASSERT_TRUE(isPng(png));
    VCImage* back = VCImage_createEmpty(0, 0, VC_FORMAT_RGBA);
    ASSERT_EQ(VCImage_decodeFromJpeg(back, png.data(), static_cast<int>(png.size())), 0);
    EXPECT_EQ(bytesOf(back), bytesOf(image));
    VCImage_destroy(back);

    // Anything else: the raw buffer, as long as the size field says.
    EXPECT_EQ(VCImage_saveToFile(image, dir.file("frame.yuv").c_str(), 85), 0);
    EXPECT_EQ(readFile(dir.file("frame.yuv")), bytesOf(image));
    Bytes pixels(100, 3);
    VCImage* sizeless = VCImage_createWrap(pixels.data(), 5, 5, VC_FORMAT_RGBA, 0, 0);
    EXPECT_EQ(VCImage_saveToFile(sizeless, dir.file("sizeless.raw").c_str(), 85), 0);
    EXPECT_TRUE(fileExists(dir.file("sizeless.raw")));
    EXPECT_TRUE(readFile(dir.file("sizeless.raw")).empty());
    VCImage* half = VCImage_createWrap(pixels.data(), 5, 5, VC_FORMAT_RGBA, 50, 0);
    EXPECT_EQ(VCImage_saveToFile(half, dir.file("half.raw").c_str(), 85), 0);
    EXPECT_EQ(readFile(dir.file("half.raw")).size(), 50u);

    // A JPEG that cannot be encoded is only logged; nothing is written.
    LogCapture log;
    VCImage* odd = VCImage_createWrap(pixels.data(), 5, 5, VC_FOURCC('A', 'B', 'C', 'D'), 100, 0);
    EXPECT_EQ(VCImage_saveToFile(odd, dir.file("bad.jpg").c_str(), 85), 0);
    EXPECT_TRUE(log.contains(VF_LOG_ERROR, "Encoding failed (5x5 ABCD)"));
    EXPECT_FALSE(fileExists(dir.file("bad.jpg")));

    log.clear();
    EXPECT_EQ(VCImage_saveToFile(nullptr, dir.file("n.jpg").c_str(), 85), VC_ERROR_NULL_PARAM);
    EXPECT_EQ(VCImage_saveToFile(image, nullptr, 85), VC_ERROR_NULL_PARAM);
    EXPECT_EQ(countErrors(log, "VC_ERROR_NULL_PARAM", -2), 2);

    for (VCImage* i : {image, sizeless, half, odd}) VCImage_destroy(i);
}

TEST(VcFile, PngSaveStoresStraightAlpha) {
    TempDir dir;
    // Premultiplied input: colour ≤ alpha, except the last pixel which is out
    // of range and must saturate.
    Bytes premultiplied = {100, 50, 0, 128, 10, 20, 30, 0, 255, 128, 1, 255, 200, 10, 0, 100};
    VCImage* image = VCImage_createWrap(premultiplied.data(), 4, 1, VC_FORMAT_RGBA,
                                        static_cast<int>(premultiplied.size()), 0);
    std::string path = dir.file("alpha.png");
    ASSERT_EQ(VCImage_saveToFile(image, path.c_str(), 85), 0);
    VCImage* back = VCImage_createEmpty(0, 0, VC_FORMAT_RGBA);
    ASSERT_EQ(VCImage_loadFromFile(back, path.c_str()), 0);
    ASSERT_EQ(shapeOf(back), "4x1");
    for (int i = 0; i < 4; ++i) {
        int a = premultiplied[i * 4 + 3];
        EXPECT_EQ(back->data[i * 4 + 3], a);
        for (int c = 0; c < 3; ++c) {
            int v = premultiplied[i * 4 + c];
            long expected = a == 0 ? 0 : std::min(255L, std::lround(v * 255.0 / a));
            EXPECT_EQ(back->data[i * 4 + c], expected) << "pixel " << i << " channel " << c;
        }
    }
    VCImage_destroy(back);

    // The encoder of our own keeps straight alpha as it is.
    size_t length = 0;
    unsigned char* stream = VCPicture_encodePng(image, &length);
    ASSERT_NE(stream, nullptr);
    back = VCImage_createEmpty(0, 0, VC_FORMAT_RGBA);
    ASSERT_EQ(VCImage_decodeFromJpeg(back, stream, static_cast<int>(length)), 0);
    EXPECT_EQ(bytesOf(back), premultiplied);
    free(stream);
    VCImage_destroy(back);
    VCImage* shortRgba = VCImage_createWrap(premultiplied.data(), 4, 2, VC_FORMAT_RGBA, 16, 0);
    VCImage* bgra = VCImage_createWrap(premultiplied.data(), 4, 1, VC_FORMAT_BGRA, 16, 0);
    for (VCImage* refused : {shortRgba, bgra, static_cast<VCImage*>(nullptr)}) {
        EXPECT_EQ(VCPicture_encodePng(refused, &length), nullptr);
        VCImage_destroy(refused);
    }
    VCImage_destroy(image);

    // Other formats go through an RGBA copy.
    Bytes bgr = {1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15, 16, 17, 18};
    VCImage* bgrImage = VCImage_createWrap(bgr.data(), 3, 2, VC_FORMAT_BGR8, 18, 0);
    ASSERT_EQ(VCImage_saveToFile(bgrImage, dir.file("bgr.png").c_str(), 85), 0);
    back = VCImage_createEmpty(0, 0, VC_FORMAT_RGBA);
    ASSERT_EQ(VCImage_loadFromFile(back, dir.file("bgr.png").c_str()), 0);
    EXPECT_EQ(bytesOf(back), Bytes({3,  2,  1,  255, 6,  5,  4,  255, 9,  8,  7,  255,
                                    12, 11, 10, 255, 15, 14, 13, 255, 18, 17, 16, 255}));
    VCImage_destroy(back);
    VCImage_destroy(bgrImage);

    // Failures: no RGBA copy possible, file not creatable, no pixels.
    LogCapture log;
    Bytes yuv(3 * 3 * 2, 0);
    VCImage* oddYuv = VCImage_createWrap(yuv.data(), 3, 3, VC_FORMAT_NV21, 14, 0);
    EXPECT_EQ(VCImage_saveToFile(oddYuv, dir.file("odd.png").c_str(), 85), VC_ERROR_UNKNOWN);
    EXPECT_EQ(countErrors(log, "VC_ERROR_UNKNOWN", -1), 1);
    EXPECT_FALSE(fileExists(dir.file("odd.png")));
    VCImage_destroy(oddYuv);

    VCImage* rgba = makeRgba(4, 4);
    log.clear();
    EXPECT_EQ(VCImage_saveToFile(rgba, dir.file("missing/x.png").c_str(), 85), VC_ERROR_UNKNOWN);
    EXPECT_TRUE(log.contains(VF_LOG_ERROR, "Failed to save RGBA image with Skia!"));
    EXPECT_EQ(countErrors(log, "VC_ERROR_UNKNOWN", -1), 1);
    VCImage* noPixels = VCImage_createEmpty(4, 4, VC_FORMAT_RGBA);
    log.clear();
    EXPECT_EQ(VCImage_saveToFile(noPixels, dir.file("none.png").c_str(), 85), VC_ERROR_UNKNOWN);
    EXPECT_TRUE(log.contains(VF_LOG_ERROR, "Failed to save RGBA image with Skia!"));
    VCImage* shortBuffer = VCImage_createWrap(rgba->data, 4, 4, VC_FORMAT_RGBA, 60, 0);
    EXPECT_EQ(VCImage_saveToFile(shortBuffer, dir.file("short.png").c_str(), 85),
              VC_ERROR_INVALID_SIZE);
    for (VCImage* i : {rgba, noPixels, shortBuffer}) VCImage_destroy(i);
}

TEST(VcFile, LoadFromFile) {
    TempDir dir;
    VCImage* image = makeRgba(40, 30);
    ASSERT_EQ(VCImage_saveToFile(image, dir.file("in.png").c_str(), 85), 0);
    VCImage* loaded = VCImage_createEmpty(0, 0, VC_FORMAT_RGBA);
    ASSERT_EQ(VCImage_loadFromFile(loaded, dir.file("in.png").c_str()), 0);
    EXPECT_EQ(shapeOf(loaded), "40x30");
    EXPECT_EQ(bytesOf(loaded), bytesOf(image));
    VCImage_destroy(loaded);

    if (!fastCodecInstalled()) {
        ASSERT_EQ(VCImage_saveToFile(image, dir.file("in.jpg").c_str(), 90), 0);
        Bytes jpeg = readFile(dir.file("in.jpg"));
        VCImage* direct = VCImage_createEmpty(0, 0, VC_FORMAT_NV21);
        ASSERT_EQ(VCImage_decodeFromJpeg(direct, jpeg.data(), static_cast<int>(jpeg.size())), 0);
        loaded = VCImage_createEmpty(0, 0, VC_FORMAT_NV21);
        ASSERT_EQ(VCImage_loadFromFile(loaded, dir.file("in.jpg").c_str()), 0);
        EXPECT_EQ(shapeOf(loaded), "40x30");
        EXPECT_EQ(bytesOf(loaded), bytesOf(direct));
        VCImage_destroy(loaded);
        VCImage_destroy(direct);

        // A picture that decodes but cannot become NV21 (odd width) leaves the
        // record as it was, and so does a header promising 3.6 GB of
        // pixels: neither is then taken for raw pixels of its own geometry.
        VCImage* oddRgba = VCImage_createNew(63, 48, VC_FORMAT_RGBA);
        memset(oddRgba->data, 0x40, oddRgba->size);
        ASSERT_EQ(VCImage_saveToFile(oddRgba, dir.file("odd.jpg").c_str(), 90), 0);
        Bytes bomb = jpegDeclaring(readFile(dir.file("odd.jpg")), 30000, 30000);
        writeFile(dir.file("bomb.jpg"), bomb);
        struct Case {
            const char* file;
            uint32_t format;
            int status;
        } refusals[] = {{"odd.jpg", VC_FORMAT_NV21, VC_ERROR_INVALID_SIZE},
                        {"bomb.jpg", VC_FORMAT_RGBA, VC_ERROR_INVALID_SIZE}};
        for (const Case& c : refusals) {
            VCImage* target = VCImage_createEmpty(0, 0, c.format);
            LogCapture refusedLog;
            EXPECT_EQ(VCImage_loadFromFile(target, dir.file(c.file).c_str()), c.status) << c.file;
            EXPECT_EQ(shapeOf(target), "0x0") << c.file;
            EXPECT_EQ(target->data, nullptr) << c.file;
            EXPECT_EQ(refusedLog.countPrefix("Decoding as raw image"), 0u) << c.file;
            VCImage_destroy(target);
        }
        VCImage_destroy(oddRgba);
    }

    // Raw NV21 bytes into an image that already knows its geometry; the file
    // buffer replaces the buffer it had.
    Bytes raw(640 * 480 * 3 / 2);
    for (size_t i = 0; i < raw.size(); ++i) raw[i] = static_cast<unsigned char>(i * 7 + 1);
    writeFile(dir.file("frame.nv21"), raw);
    VCImage* nv21 = VCImage_createNew(640, 480, VC_FORMAT_NV21);
    LogCapture log;
    ASSERT_EQ(VCImage_loadFromFile(nv21, dir.file("frame.nv21").c_str()), 0);
    EXPECT_TRUE(log.contains(VF_LOG_DEBUG, "Decoding as raw image: 640x480 'NV21'"));
    EXPECT_EQ(shapeOf(nv21), "640x480");
    EXPECT_EQ(nv21->wrapped, 0);
    EXPECT_EQ(bytesOf(nv21), raw);
    // The length is not compared with the geometry.
    writeFile(dir.file("short.nv21"), Bytes(1000, 9));
    ASSERT_EQ(VCImage_loadFromFile(nv21, dir.file("short.nv21").c_str()), 0);
    EXPECT_EQ(nv21->size, 1000u);
    EXPECT_EQ(nv21->data[999], 9);
    VCImage_destroy(nv21);

    // Failures.
    log.clear();
    writeFile(dir.file("empty.jpg"), Bytes());
    VCImage* target = VCImage_createEmpty(0, 0, VC_FORMAT_RGBA);
    EXPECT_EQ(VCImage_loadFromFile(target, dir.file("empty.jpg").c_str()), VC_ERROR_IO_FAILED);
    EXPECT_EQ(VCImage_loadFromFile(target, dir.file("absent.jpg").c_str()), VC_ERROR_IO_FAILED);
    EXPECT_EQ(VCImage_loadFromFile(target, dir.path().c_str()), VC_ERROR_IO_FAILED);
    EXPECT_EQ(countErrors(log, "VC_ERROR_IO_FAILED", -8), 3);
    EXPECT_EQ(VCPicture_lastFailure(), VC_DECODE_READ_FAILED);
    writeFile(dir.file("garbage.jpg"), text("not a picture at all"));
    EXPECT_EQ(VCImage_loadFromFile(target, dir.file("garbage.jpg").c_str()), VC_ERROR_CODEC_FAILED);
    EXPECT_EQ(VCPicture_lastFailure(), VC_DECODE_NOT_A_PICTURE);
    EXPECT_EQ(target->data, nullptr);
    EXPECT_FALSE(log.contains(VF_LOG_DEBUG, "Decoding as raw image: 0x0 'RGBA'"));
    log.clear();
    EXPECT_EQ(VCImage_loadFromFile(nullptr, dir.file("in.png").c_str()), VC_ERROR_NULL_PARAM);
    EXPECT_EQ(VCImage_loadFromFile(target, nullptr), VC_ERROR_NULL_PARAM);
    EXPECT_EQ(countErrors(log, "VC_ERROR_NULL_PARAM", -2), 2);
    VCImage_destroy(target);
    VCImage_destroy(image);
}
