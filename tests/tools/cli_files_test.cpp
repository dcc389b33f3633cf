// The kivimaging program against bad and unusual files: every input it cannot
// use is refused with its reason and nothing written; every output is whole
// and readable or not there at all, also on a full or read-only disk.
#include <errno.h>
#include <gtest/gtest.h>
#include <string.h>
#include <strings.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <libexif/exif-data.h>

#include <set>
#include <string>
#include <vector>

#include "cli_fixture.h"
#include "support/gl_context.h"
#include "support/picture_streams.h"

namespace {

using kivtest::Bytes;

bool startsWith(const Bytes& bytes, const Bytes& prefix) {
    return bytes.size() >= prefix.size() && std::equal(prefix.begin(), prefix.end(), bytes.begin());
}
const Bytes kPngMagic = {0x89, 'P', 'N', 'G'};
const Bytes kJpegMagic = {0xFF, 0xD8};

// An RGB JPEG of four flat quadrants: red, green / blue, white.
Bytes quadrantsJpeg(int w, int h) {
    Bytes rgb(static_cast<size_t>(w) * h * 3);
    for (int y = 0; y < h; ++y)
        for (int x = 0; x < w; ++x) {
            unsigned char* p = &rgb[(static_cast<size_t>(y) * w + x) * 3];
            bool right = x >= w / 2, bottom = y >= h / 2;
            p[0] = (!bottom && !right) || (bottom && right) ? 255 : 0;
            p[1] = (!bottom && right) || (bottom && right) ? 255 : 0;
            p[2] = bottom ? 255 : 0;
        }
    return kivtest::makeJpeg(w, h, JCS_RGB, 3, JCS_YCbCr, rgb);
}

// `jpeg` with an EXIF block saying `orientation`, right after its start marker.
Bytes withOrientation(const Bytes& jpeg, int orientation) {
    ExifData* exif = exif_data_new();
    exif_data_set_byte_order(exif, EXIF_BYTE_ORDER_MOTOROLA);
    ExifEntry* entry = exif_entry_new();
    exif_content_add_entry(exif->ifd[EXIF_IFD_0], entry);
    exif_entry_initialize(entry, EXIF_TAG_ORIENTATION);
    exif_set_short(entry->data, EXIF_BYTE_ORDER_MOTOROLA, static_cast<ExifShort>(orientation));
    exif_entry_unref(entry);
    unsigned char* block = nullptr;
    unsigned int size = 0;
    exif_data_save_data(exif, &block, &size);
    exif_data_unref(exif);
    Bytes out(jpeg.begin(), jpeg.begin() + 2);
    out.push_back(0xFF);
    out.push_back(0xE1);
    out.push_back(static_cast<unsigned char>((size + 2) >> 8));
    out.push_back(static_cast<unsigned char>(size + 2));
    out.insert(out.end(), block, block + size);
    out.insert(out.end(), jpeg.begin() + 2, jpeg.end());
    free(block);
    return out;
}

class CliFiles : public CliTest {};

TEST_F(CliFiles, BadInputsAreRefusedWithTheirReason) {
    // The GPU's own limit, as the tool must find it.
    GLint limit = 0;
    {
        GlContext gl;
        ASSERT_TRUE(gl.ok());
        glGetIntegerv(GL_MAX_TEXTURE_SIZE, &limit);
    }
    ASSERT_GT(limit, 0);
    ImagePtr picture(VCImage_createNew(32, 32, VC_FORMAT_RGBA));
    memset(picture->data, 0x80, picture->size);
    const Bytes jpeg = kivtest::encodeJpeg(picture.get());
    kivtest::PngPicture small;
    small.width = small.height = 16;
    small.samples.assign(16 * 16 * 4, 0x80);
    const Bytes png = kivtest::makePng(small);
    Bytes badTable = jpeg, twelveBit = jpeg, badCrc = png;
    badTable[kivtest::findMarker(jpeg, 0xDB) + 2] = 0x07;
    twelveBit[kivtest::findMarker(jpeg, 0xC0) + 2] = 12;
    badCrc[29] ^= 0x55;
    const std::string big = std::to_string(limit + 1);

    ASSERT_EQ(0, mkdir(path("folder.png").c_str(), 0755));
    struct Case {
        const char* name;
        Bytes data;    // written to the file first, unless `special`
        bool special;  // made above, or absent
        std::string reason;
    } cases[] = {
        {"missing.png", {}, true, "No such file or directory"},
        {"folder.png", {}, true, "it is a directory"},
        {"empty.png", {}, false, "the file is empty"},
        {"text.jpg", Bytes(40, 'x'), false, "it is not a JPEG or PNG picture"},
        {"marker.jpg", {0xFF, 0xD8}, false, "the data is truncated"},
        {"half.jpg", Bytes(jpeg.begin(), jpeg.begin() + jpeg.size() / 2), false,
         "the data is truncated"},
        {"half.png", Bytes(png.begin(), png.begin() + png.size() / 2), false,
         "the data is truncated"},
        {"table.jpg", badTable, false, "the data is corrupt"},
        {"crc.png", badCrc, false, "the data is corrupt"},
        {"two.jpg", kivtest::makeJpeg(8, 8, JCS_UNKNOWN, 2, JCS_UNKNOWN, Bytes(128, 9)), false,
         "its colour space is not supported"},
        {"twelve.jpg", twelveBit, false, "its coding is not supported"},
        {"bomb.jpg", kivtest::jpegDeclaring(jpeg, 30000, 30000), false,
         "30000x30000 is larger than this GPU's"},
        {"wide.png", kivtest::pngDeclaring(limit + 1, 8), false,
         big + "x8 is larger than this GPU's"},
        {"tall.jpg", kivtest::jpegDeclaring(jpeg, 8, limit + 1), false,
         "8x" + big + " is larger than this GPU's"},
    };
    // All in one batch, with one good picture: each is refused with its own
    // reason, the good one is still written, the exit code reports the rest.
    // Fisheye reads anywhere, so pictures larger than a texture are refused
    // rather than drawn in tiles.
    std::vector<std::string> args = {"apply", "-e", "417", writePng("good.png", 16, 8)};
    for (const Case& c : cases) {
        if (!c.special) {
            ASSERT_TRUE(kivtest::writeFile(path(c.name), c.data));
        }
        args.push_back(path(c.name));
    }
    args.insert(args.end(), {"-o", path("batch")});
    CliResult r = run(args);
    EXPECT_EQ(1, r.status);
    for (const Case& c : cases)
        EXPECT_NE(std::string::npos, r.err.find("'" + path(c.name) + "': " + c.reason)) << c.name;
    EXPECT_NE(std::string::npos,
              r.out.find("1 of " + std::to_string(args.size() - 5) + " pictures written"))
        << r.out;
    EXPECT_EQ(namesIn(path("batch")), (std::set<std::string>{"good.png"}));
    // The limit the tool names is the GPU's own, whatever it is.
    EXPECT_NE(std::string::npos,
              r.err.find(big + "x8 is larger than this GPU's " + std::to_string(limit) + " limit"))
        << r.err;

    // The gallery reads its picture the same way.
    r = run({"gallery", path("half.png"), "-o", path("sheet.png")});
    EXPECT_EQ(1, r.status);
    EXPECT_NE(std::string::npos, r.err.find("'" + path("half.png") + "': the data is truncated"))
        << r.err;
    EXPECT_FALSE(exists("sheet.png"));
}

// A FIFO is read as it streams (a process substitution is one); its writer
// gives up after a while should the tool never read.
TEST_F(CliFiles, StreamedInputsAreRead) {
    writePng("streamed.png", 48, 32);
    ASSERT_EQ(0, mkfifo(path("pipe.png").c_str(), 0644));
    CliResult r = run({"apply", "-e", "400", path("pipe.png"), "-o", path("read.png")},
                      "timeout 20 sh -c \"cat '" + path("streamed.png") + "' >'" +
                          path("pipe.png") + "'\" </dev/null >/dev/null 2>&1 & ");
    ASSERT_EQ(0, r.status) << r.err;
    ImagePtr out = loadPicture(path("read.png"));
    ASSERT_NE(nullptr, out);
    EXPECT_EQ(48 * 100 + 32, out->width * 100 + out->height);
}

// Files larger than the first bytes read at once (256 KB) are decoded as
// they are read: the same bytes as a picture read whole (through a FIFO),
// turned pictures still turned, EXIF beyond those first bytes still found
// (the file is then read whole), and a file that ends early truncated.
TEST_F(CliFiles, LargeFilesAreDecodedAsTheyAreRead) {
    const int w = 640, h = 480;
    Bytes noise(w * h * 3);
    uint32_t seed = 7;
    for (unsigned char& b : noise) b = (unsigned char)((seed = seed * 1664525u + 1013904223u) >> 24);
    const Bytes big = kivtest::makeJpeg(w, h, JCS_RGB, 3, JCS_YCbCr, noise);
    ASSERT_GT(big.size(), 300u << 10);
    Bytes far = withOrientation(big, 6);
    for (int i = 0; i < 5; ++i) {  // 300 KB of segments no decoder keeps, before the EXIF
        Bytes segment = {0xFF, 0xE9, 0xEA, 0x60};
        segment.resize(2 + 0xEA60, 0x20);
        far.insert(far.begin() + 2, segment.begin(), segment.end());
    }
    ASSERT_TRUE(kivtest::writeFile(path("big.jpg"), big));
    ASSERT_TRUE(kivtest::writeFile(path("turned.jpg"), withOrientation(big, 6)));
    ASSERT_TRUE(kivtest::writeFile(path("far.jpg"), far));
    ASSERT_TRUE(kivtest::writeFile(path("short.jpg"), Bytes(big.begin(), big.end() - 1000)));
    CliResult r = run({"apply", "-e", "401", path("big.jpg"), path("turned.jpg"), path("far.jpg"),
                       path("short.jpg"), "-o", path("out")});
    EXPECT_EQ(1, r.status);
    EXPECT_NE(std::string::npos, r.err.find("'" + path("short.jpg") + "': the data is truncated"))
        << r.err;
    for (const char* name : {"big.jpg", "turned.jpg", "far.jpg"}) {
        ImagePtr out = loadPicture(path(std::string("out/") + name));
        ASSERT_NE(nullptr, out) << name;
        const bool turned = std::string(name) != "big.jpg";
        EXPECT_EQ(turned ? h : w, out->width) << name;
    }
    ASSERT_EQ(0, mkfifo(path("pipe.jpg").c_str(), 0644));
    r = run({"apply", "-e", "401", path("pipe.jpg"), "-o", path("piped.jpg")},
            "timeout 20 sh -c \"cat '" + path("big.jpg") + "' >'" + path("pipe.jpg") +
                "'\" </dev/null >/dev/null 2>&1 & ");
    ASSERT_EQ(0, r.status) << r.err;
    EXPECT_TRUE(kivtest::readFile(path("piped.jpg")) == kivtest::readFile(path("out/big.jpg")));
}

TEST_F(CliFiles, JpegsAreTurnedUprightAsTheirExifSays) {
    const int w = 64, h = 32;
    const Bytes plain = quadrantsJpeg(w, h);
    enum { R, G, B, W };
    const unsigned char colour[4][3] = {{255, 0, 0}, {0, 255, 0}, {0, 0, 255}, {255, 255, 255}};
    // The stored corners (top-left red, top-right green, bottom-left blue,
    // bottom-right white) where each orientation shows them: TL, TR, BL, BR.
    const int corners[9][4] = {{},           {R, G, B, W}, {G, R, W, B}, {W, B, G, R}, {B, W, R, G},
                               {R, B, G, W}, {B, R, W, G}, {W, G, B, R}, {G, W, R, B}};
    std::vector<std::string> args = {"apply", "-e", "400", "-q", "100"};
    for (int orientation = 1; orientation <= 8; ++orientation) {
        args.push_back(path("o" + std::to_string(orientation) + ".jpg"));
        ASSERT_TRUE(kivtest::writeFile(args.back(), withOrientation(plain, orientation)));
    }
    args.insert(args.end(), {"-o", path("upright")});
    CliResult r = run(args);
    ASSERT_EQ(0, r.status) << r.err;
    for (int orientation = 1; orientation <= 8; ++orientation) {
        ImagePtr out = loadPicture(path("upright/o" + std::to_string(orientation) + ".jpg"));
        ASSERT_NE(nullptr, out);
        const bool turned = orientation >= 5;
        ASSERT_EQ(turned ? h : w, out->width) << orientation;
        ASSERT_EQ(turned ? w : h, out->height) << orientation;
        const int x1 = out->width - 4, y1 = out->height - 4;
        const int at[4][2] = {{3, 3}, {x1, 3}, {3, y1}, {x1, y1}};
        for (int k = 0; k < 4; ++k) {
            const unsigned char* p = out->data + (at[k][1] * out->width + at[k][0]) * 4;
            for (int ch = 0; ch < 3; ++ch)
                EXPECT_NEAR(colour[corners[orientation][k]][ch], p[ch], 8)
                    << "orientation " << orientation << " corner " << k;
        }
    }
}

// Half-transparent and nearly transparent pixels keep their colour as they
// are, through an effect that passes pixels on.
TEST_F(CliFiles, StraightAlphaIsKeptExactly) {
    const Bytes pixels = {100, 100, 100, 128, 250, 3, 77, 1, 9, 200, 31, 254, 0, 0, 0, 0};
    Bytes picture;
    for (int i = 0; i < 4; ++i) picture.insert(picture.end(), pixels.begin(), pixels.end());
    const std::string in =
        writePng("alpha.png", *VCImageTest_wrap(picture.data(), 4, 4, VC_FORMAT_RGBA));
    CliResult r = run({"apply", "-e", "400", in, "-o", path("kept.png")});
    ASSERT_EQ(0, r.status) << r.err;
    ImagePtr out = loadPicture(path("kept.png"));
    ASSERT_NE(nullptr, out);
    EXPECT_EQ(picture, VCImageTest_bytes(*out));
}

// The format follows the last extension, in any case; the file replaces a
// longer one whole, with the umask's permissions.
TEST_F(CliFiles, OutputsReplaceWholeWithUsualPermissionsInTheirFormat) {
    std::string in = writePng("in.png", 24, 16);
    ASSERT_EQ(0, mkdir(path("pics.jpg").c_str(), 0755));
    struct Case {
        const char* output;
        const char* umask;
        int status;
        const char* message;  // expected on standard error, or the mode
    } cases[] = {
        {"a.jpg", "022", 0, "644"},
        {"b.png", "022", 0, "644"},
        {"c.jpg", "027", 0, "640"},
        {"x.jpg.png", "022", 0, "644"},
        {"pics.jpg/sheet.png", "022", 0, "644"},
        {"y.png.jpg", "022", 0, "644"},
        {"z.PNG", "022", 0, "644"},
        {"w.Jpeg", "022", 0, "644"},
        {"missing/d.png", "022", 1, "No such file or directory"},
        {"in.png/e.png", "022", 1, "Not a directory"},
    };
    for (const Case& c : cases) {
        const std::string out = path(c.output);
        // An old, longer file stands at the target first, where one can.
        if (c.status == 0) {
            ASSERT_TRUE(kivtest::writeFile(out, Bytes(1 << 16, 'o')));
        }
        CliResult r =
            run({"apply", "-e", "403", in, "-o", out}, std::string("umask ") + c.umask + "; ");
        EXPECT_EQ(c.status, r.status) << c.output << ": " << r.err;
        if (c.status != 0) {
            EXPECT_NE(std::string::npos, r.err.find("cannot write '" + out + "': " + c.message))
                << r.err;
            continue;
        }
        struct stat st;
        ASSERT_EQ(0, stat(out.c_str(), &st));
        char mode[8];
        snprintf(mode, sizeof(mode), "%o", st.st_mode & 0777);
        EXPECT_STREQ(c.message, mode) << c.output;
        EXPECT_LT(st.st_size, 1 << 16) << c.output;
        const bool png = strcasecmp(out.c_str() + out.size() - 3, "png") == 0;
        EXPECT_TRUE(startsWith(kivtest::readFile(out), png ? kPngMagic : kJpegMagic)) << c.output;
        EXPECT_NE(nullptr, loadPicture(out)) << c.output;
    }
    // Nothing but the outputs is left behind.
    EXPECT_EQ(namesIn(path("pics.jpg")), (std::set<std::string>{"sheet.png"}));
    EXPECT_EQ(namesIn(mDir.path()),
              (std::set<std::string>{"in.png", "a.jpg", "b.png", "c.jpg", "x.jpg.png", "pics.jpg",
                                     "y.png.jpg", "z.PNG", "w.Jpeg"}));
}

TEST_F(CliFiles, ConcurrentWritersLeaveOneWholePicture) {
    // Four writers of one output, three times over: each renames a complete
    // file of its own into place, so every one succeeds and one wins.
    const std::string out = path("shared.jpg");
    const int sizes[] = {64, 96, 128, 160};
    for (int round = 0; round < 3; ++round) {
        std::string script;
        for (int i = 0; i < 4; ++i) {
            script += "('" KIVIMAGING_PROGRAM "' sample -o '" + out + "' --size " +
                      std::to_string(sizes[i]) + "x64 >/dev/null 2>&1; echo $? >'" +
                      path("status" + std::to_string(i)) + "') & ";
        }
        ASSERT_EQ(0, system((script + "wait").c_str()));
        for (int i = 0; i < 4; ++i)
            EXPECT_EQ("0\n", kivtest::readText(path("status" + std::to_string(i)))) << i;
        ImagePtr picture = loadPicture(out);
        ASSERT_NE(nullptr, picture);
        EXPECT_EQ(64, picture->height);
        EXPECT_TRUE(std::count(std::begin(sizes), std::end(sizes), picture->width) == 1);
    }
    std::set<std::string> names = namesIn(mDir.path());
    EXPECT_EQ(names,
              (std::set<std::string>{"shared.jpg", "status0", "status1", "status2", "status3"}));
}

// A real small file system: a 64 KB tmpfs and a read-only one, mounted for
// the test (root only) and always unmounted.
class CliSmallDisk : public CliTest {
protected:
    void SetUp() override {
        CliTest::SetUp();
        if (geteuid() != 0) GTEST_SKIP() << "mounting a small tmpfs needs root";
        for (const char* name : {"small", "readonly"}) {
            ASSERT_EQ(0, mkdir(path(name).c_str(), 0755));
        }
        if (mount("tmpfs", path("small").c_str(), "tmpfs", MS_NOSUID | MS_NODEV,
                  "size=64k,mode=0755") != 0) {
            GTEST_SKIP() << "cannot mount a tmpfs here: " << strerror(errno);
        }
        mMounted.push_back(path("small"));
        ASSERT_EQ(0, mount("tmpfs", path("readonly").c_str(), "tmpfs",
                           MS_NOSUID | MS_NODEV | MS_RDONLY, "size=64k"))
            << strerror(errno);
        mMounted.push_back(path("readonly"));
    }
    void TearDown() override {
        for (const std::string& where : mMounted) EXPECT_EQ(0, umount2(where.c_str(), MNT_DETACH));
    }
    std::vector<std::string> mMounted;
};

TEST_F(CliSmallDisk, FullOrReadOnlyDiskFailsCleanly) {
    // Noise compresses badly: > 64 KB as JPEG or PNG.
    ImagePtr random = VCImageTest_random(256, 256, VC_FORMAT_RGBA, 12345);
    for (uint32_t i = 3; i < random->size; i += 4) random->data[i] = 255;
    const std::string noise = writePng("noise.png", *random);
    const uint8_t grey[4] = {128, 128, 128, 255};
    const std::string flat = writePng("flat.png", 64, 64, grey);  // a few KB
    const Bytes old = kivtest::readFile(flat);
    ASSERT_TRUE(kivtest::writeFile(path("small/old.jpg"), old));
    struct Case {
        std::vector<std::string> inputs;
        const char* output;
        const char* reason;
    } cases[] = {
        {{noise}, "small/new.jpg", "No space left on device"},
        {{noise}, "small/new.png", "No space left on device"},
        {{noise}, "small/old.jpg", "No space left on device"},  // the old file stays
        {{noise}, "readonly/new.png", "Read-only file system"},
    };
    for (const Case& c : cases) {
        std::vector<std::string> args = {"apply", "-e", "400"};
        args.insert(args.end(), c.inputs.begin(), c.inputs.end());
        args.insert(args.end(), {"-o", path(c.output)});
        CliResult r = run(args);
        EXPECT_EQ(1, r.status) << c.output;
        EXPECT_NE(std::string::npos,
                  r.err.find("cannot write '" + path(c.output) + "': " + c.reason))
            << c.output << ": " << r.err;
        EXPECT_EQ(std::string::npos, r.out.find(path(c.output))) << "reported as written";
    }
    EXPECT_EQ(namesIn(path("small")), (std::set<std::string>{"old.jpg"}));
    EXPECT_EQ(kivtest::readFile(path("small/old.jpg")), old);

    // Two pictures into a folder on the small disk: the one that fits is
    // written whole, the other not at all.
    ASSERT_EQ(0, unlink(path("small/old.jpg").c_str()));
    CliResult r = run({"apply", "-e", "400", flat, noise, "-o", path("small/batch")});
    EXPECT_EQ(1, r.status);
    EXPECT_NE(std::string::npos, r.out.find("1 of 2 pictures written")) << r.out;
    EXPECT_NE(std::string::npos, r.err.find("No space left on device")) << r.err;
    EXPECT_EQ(namesIn(path("small/batch")), (std::set<std::string>{"flat.png"}));
    ImagePtr written = loadPicture(path("small/batch/flat.png"));
    ASSERT_NE(nullptr, written);
    EXPECT_EQ(64, written->width);
}

}  // namespace
