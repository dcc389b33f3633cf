// The kivimaging program end to end, run as a subprocess: exit codes and
// messages, the effect list, an effect applied to a file, the gallery.
#include <gtest/gtest.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include <android/log.h>

#include "core/KivImaging.h"
#include "vccore/vc_file.h"
#include "vccore/vc_log.h"

namespace {

struct Result {
    int status;
    std::string out;
    std::string err;
};

std::string readAll(const std::string& path) {
    std::ifstream f(path, std::ios::binary);
    std::stringstream s;
    s << f.rdbuf();
    return s.str();
}

void quietLog(int, const char*, ...) {}

class Cli : public ::testing::Test {
protected:
    void SetUp() override {
        // The suite asks the factory about a thousand ids itself; keep its own log short.
        VF_LogMsg = quietLog;
        __android_log_set_minimum_priority(ANDROID_LOG_WARN);
        char tmpl[] = "/tmp/kivcli_test_XXXXXX";
        ASSERT_NE(nullptr, mkdtemp(tmpl));
        mDir = tmpl;
    }
    void TearDown() override {
        std::string cmd = "rm -rf '" + mDir + "'";
        EXPECT_EQ(0, system(cmd.c_str()));
    }

    std::string path(const std::string& name) const { return mDir + "/" + name; }

    // Arguments are quoted for the shell; none of ours contains a quote.
    Result run(const std::vector<std::string>& args) {
        std::string cmd = "'" KIVIMAGING_PROGRAM "'";
        for (const std::string& a : args) cmd += " '" + a + "'";
        cmd += " >'" + path("stdout") + "' 2>'" + path("stderr") + "' </dev/null";
        int raw = system(cmd.c_str());
        Result r;
        r.status = WIFEXITED(raw) ? WEXITSTATUS(raw) : 1000 + raw;
        r.out = readAll(path("stdout"));
        r.err = readAll(path("stderr"));
        return r;
    }

    // A w×h "RGBA" picture whose channels vary independently, saved as PNG.
    std::string writeGradientPng(const std::string& name, int w, int h) {
        VCImage* image = VCImage_createNew(w, h, VC_FORMAT_RGBA);
        EXPECT_NE(nullptr, image);
        for (int y = 0; y < h; y++) {
            for (int x = 0; x < w; x++) {
                uint8_t* p = image->data + (y * w + x) * 4;
                p[0] = static_cast<uint8_t>(x * 255 / (w - 1));
                p[1] = static_cast<uint8_t>(y * 255 / (h - 1));
                p[2] = static_cast<uint8_t>((x * 7 + y * 13) & 0xff);
                p[3] = 255;
            }
        }
        std::string file = path(name);
        EXPECT_EQ(VC_OK, VCImage_saveToFile(image, file.c_str(), 100));
        VCImage_destroy(image);
        return file;
    }

    VCImage* load(const std::string& file) {
        VCImage* image = VCImage_createEmpty(0, 0, VC_FORMAT_RGBA);
        if (VCImage_loadFromFile(image, file.c_str()) != VC_OK) {
            VCImage_destroy(image);
            return nullptr;
        }
        return image;
    }

    std::string mDir;
};

TEST_F(Cli, UsageErrorsExitTwoWithAMessage) {
    Result r = run({});
    EXPECT_EQ(2, r.status);
    EXPECT_NE(std::string::npos, r.err.find("Usage: kivimaging <command>"));

    r = run({"frobnicate"});
    EXPECT_EQ(2, r.status);
    EXPECT_NE(std::string::npos, r.err.find("unknown command 'frobnicate'")) << r.err;

    std::string in = writeGradientPng("in.png", 16, 8);
    struct Case {
        std::vector<std::string> args;
        const char* message;
    } cases[] = {
        {{"apply", in, "-o", path("o.png")}, "kivimaging apply: no effect given (-e)"},
        {{"apply", "-e", "403", "-o", path("o.png")}, "kivimaging apply: no input file given"},
        {{"apply", "-e", "403", in}, "kivimaging apply: no output given (-o)"},
        {{"apply", "-e", "404", in, "-o", path("o.png")}, "no effect has id 404"},
        {{"apply", "-e", "NoSuchLook", in, "-o", path("o.png")}, "unknown effect 'NoSuchLook'"},
        {{"apply", "-e", "403", in, "-o", path("o.bmp")}, "must end in .png, .jpg or .jpeg"},
        {{"apply", "-e", "403", "-q", "0", in, "-o", path("o.jpg")}, "--quality must be"},
        {{"apply", "-e", "403", in, "-o", in}, "would be overwritten by its result"},
        {{"apply", "-e", "403", in, in, "-o", path("d")}, "would both be written to 'in.png'"},
        {{"apply", "--bogus"}, "kivimaging apply: unknown option '--bogus'"},
        {{"gallery", "a.png", "b.png", "-o", path("g.png")}, "one input picture at most"},
        {{"gallery", "-o", path("g.png"), "--thumb", "8"}, "--thumb must be"},
        {{"sample", "-o", path("s.png"), "--size", "10x10"}, "--size must be"},
        {{"effects", "extra"}, "unexpected argument 'extra'"},
    };
    for (const Case& c : cases) {
        r = run(c.args);
        EXPECT_EQ(2, r.status) << c.message;
        EXPECT_NE(std::string::npos, r.err.find(c.message)) << "stderr: " << r.err;
        EXPECT_NE(std::string::npos, r.err.find("--help'")) << r.err;
    }
    // Nothing was written by a refused command.
    EXPECT_NE(0, access(path("o.png").c_str(), F_OK));
}

TEST_F(Cli, HelpForEveryCommand) {
    for (const char* command : {"effects", "apply", "gallery", "sample"}) {
        Result r = run({command, "--help"});
        EXPECT_EQ(0, r.status) << command;
        EXPECT_EQ(0u, r.out.find(std::string("Usage: kivimaging ") + command)) << r.out;
        Result h = run({"help", command});
        EXPECT_EQ(0, h.status);
        EXPECT_EQ(r.out, h.out);
    }
    Result r = run({"--help"});
    EXPECT_EQ(0, r.status);
    EXPECT_NE(std::string::npos, r.out.find("gallery"));
}

TEST_F(Cli, UnreadableAndCorruptInputsExitOne) {
    std::string corrupt = path("corrupt.jpg");
    {
        std::ofstream f(corrupt, std::ios::binary);
        f << "\xff\xd8\xff\xe0 this is not really a JPEG stream";
    }
    std::string empty = path("empty.png");
    { std::ofstream f(empty, std::ios::binary); }

    Result r = run({"apply", "-e", "403", path("missing.png"), "-o", path("o.png")});
    EXPECT_EQ(1, r.status);
    EXPECT_NE(std::string::npos,
              r.err.find("cannot read '" + path("missing.png") + "': No such file or directory"))
        << r.err;

    r = run({"apply", "-e", "403", corrupt, "-o", path("o.png")});
    EXPECT_EQ(1, r.status);
    EXPECT_NE(std::string::npos, r.err.find("cannot decode '" + corrupt + "'")) << r.err;
    EXPECT_NE(0, access(path("o.png").c_str(), F_OK));

    r = run({"apply", "-e", "403", empty, "-o", path("o.png")});
    EXPECT_EQ(1, r.status);
    EXPECT_NE(std::string::npos, r.err.find("the file is empty")) << r.err;

    r = run({"gallery", corrupt, "-o", path("g.png")});
    EXPECT_EQ(1, r.status);
    EXPECT_NE(std::string::npos, r.err.find("cannot decode")) << r.err;

    // In a batch the good picture is still written; the exit code reports the bad one.
    std::string good = writeGradientPng("good.png", 16, 8);
    r = run({"apply", "-e", "403", good, corrupt, "-o", path("batch")});
    EXPECT_EQ(1, r.status);
    EXPECT_EQ(0, access(path("batch/good.png").c_str(), F_OK));
    EXPECT_NE(0, access(path("batch/corrupt.jpg").c_str(), F_OK));
    EXPECT_NE(std::string::npos, r.out.find("1 of 2 pictures written")) << r.out;
}

TEST_F(Cli, EffectsListsWhatTheFactoryServes) {
    Result r = run({"effects"});
    ASSERT_EQ(0, r.status) << r.err;
    std::istringstream lines(r.out);
    std::string line;
    int rows = 0;
    bool sawNoEffect = false;
    std::getline(lines, line);
    EXPECT_NE(std::string::npos, line.find("CLASS"));
    while (std::getline(lines, line)) {
        int id = 0, type = 0;
        char name[64] = {};
        if (sscanf(line.c_str(), "%d %63s %d", &id, name, &type) != 3) continue;
        rows++;
        if (id == 400) {
            sawNoEffect = true;
            EXPECT_STREQ("NoEffect", name);
            EXPECT_EQ(400, type);
        }
        // Every listed id is one the factory really serves.
        KivFilter* f = KivImaging_create(id, nullptr);
        EXPECT_NE(nullptr, f) << line;
        KivImaging_destroy(f);
    }
    EXPECT_TRUE(sawNoEffect) << r.out;
    // And every id the factory serves in the built-in ranges is listed.
    int served = 0;
    for (int id = 0; id < 1000; id++) {
        KivFilter* f = KivImaging_create(id, nullptr);
        if (f != nullptr) served++;
        KivImaging_destroy(f);
    }
    EXPECT_EQ(served, rows);
    EXPECT_NE(std::string::npos, r.out.find(std::to_string(served) + " effects"));
}

TEST_F(Cli, NegativeInvertsEveryChannel) {
    const int w = 37, h = 21;
    std::string in = writeGradientPng("in.png", w, h);
    std::string out = path("neg.png");
    Result r = run({"apply", "-e", "403", in, "-o", out});
    ASSERT_EQ(0, r.status) << r.err;
    EXPECT_NE(std::string::npos, r.out.find("403 Negative: " + out)) << r.out;

    VCImage* src = load(in);
    VCImage* dst = load(out);
    ASSERT_NE(nullptr, src);
    ASSERT_NE(nullptr, dst);
    ASSERT_EQ(w, dst->width);
    ASSERT_EQ(h, dst->height);
    int worst = 0;
    for (int i = 0; i < w * h; i++) {
        for (int c = 0; c < 3; c++) {
            int expected = 255 - src->data[i * 4 + c];
            worst = std::max(worst, abs(expected - dst->data[i * 4 + c]));
        }
        ASSERT_EQ(255, dst->data[i * 4 + 3]) << "alpha at pixel " << i;
    }
    EXPECT_LE(worst, 2) << "largest deviation from 255-x, in 1/255";
    // Not the identity: the input has dark and bright pixels alike.
    EXPECT_GT(abs(src->data[0] - dst->data[0]), 200);
    VCImage_destroy(src);
    VCImage_destroy(dst);

    // The class name, in any case, selects the same effect. A JPEG result
    // replaces an existing (here larger) file instead of writing into it.
    const std::string jpeg = path("neg.jpg");
    {
        std::ofstream junk(jpeg, std::ios::binary | std::ios::trunc);
        junk << std::string(1 << 20, 'x');
    }
    r = run({"apply", "-e", "negative", "-p", "intensity=10", in, "-o", jpeg});
    ASSERT_EQ(0, r.status) << r.err;
    // Negative has no options: the parameter string is reported as ignored.
    EXPECT_NE(std::string::npos, r.err.find("403 Negative takes no parameters; -p is ignored"))
        << r.err;
    struct stat st;
    ASSERT_EQ(0, stat(jpeg.c_str(), &st));
    EXPECT_LT(st.st_size, 1 << 20) << "the old file's tail survived";
    VCImage* again = load(jpeg);
    ASSERT_NE(nullptr, again);
    EXPECT_EQ(w, again->width);
    VCImage_destroy(again);
}

TEST_F(Cli, GalleryGridAndCells) {
    // A flat colour, so that every thumbnail is flat too.
    const int w = 100, h = 50;
    VCImage* flat = VCImage_createNew(w, h, VC_FORMAT_RGBA);
    ASSERT_NE(nullptr, flat);
    for (int i = 0; i < w * h; i++) {
        const uint8_t c[4] = {200, 100, 40, 255};
        memcpy(flat->data + i * 4, c, 4);
    }
    std::string in = path("flat.png");
    ASSERT_EQ(VC_OK, VCImage_saveToFile(flat, in.c_str(), 100));
    VCImage_destroy(flat);

    std::vector<int> ids;
    for (int range : {200, 400, 500}) {
        int last = range == 200 ? 213 : range == 400 ? 447 : 508;
        for (int id = range; id <= last; id++) {
            KivFilter* f = KivImaging_create(id, nullptr);
            if (f != nullptr) ids.push_back(id);
            KivImaging_destroy(f);
        }
    }
    ASSERT_FALSE(ids.empty());

    std::string out = path("gallery.png");
    Result r = run({"gallery", in, "-o", out, "--thumb", "40", "--columns", "5"});
    ASSERT_EQ(0, r.status) << r.err;
    VCImage* sheet = load(out);
    ASSERT_NE(nullptr, sheet);
    // Thumbnails 40x20; cells padded by 8 with a 13-pixel label row.
    int n = static_cast<int>(ids.size());
    int columns = std::min(5, n), rows = (n + 4) / 5;
    EXPECT_EQ(columns * (40 + 8) + 8, sheet->width);
    EXPECT_EQ(rows * (20 + 13 + 8) + 8, sheet->height);

    auto cellPixel = [&](int index, int c) {
        int x = 8 + (index % 5) * 48 + 20;
        int y = 8 + (index / 5) * 41 + 10;
        return static_cast<int>(sheet->data[(y * sheet->width + x) * 4 + c]);
    };
    for (size_t i = 0; i < ids.size(); i++) {
        if (ids[i] == 400) {
            EXPECT_NEAR(200, cellPixel(i, 0), 2);
            EXPECT_NEAR(100, cellPixel(i, 1), 2);
            EXPECT_NEAR(40, cellPixel(i, 2), 2);
        }
        if (ids[i] == 403) {
            EXPECT_NEAR(55, cellPixel(i, 0), 2);
            EXPECT_NEAR(155, cellPixel(i, 1), 2);
            EXPECT_NEAR(215, cellPixel(i, 2), 2);
        }
    }
    VCImage_destroy(sheet);
}

TEST_F(Cli, SampleWritesTheTestPicture) {
    std::string out = path("sample.png");
    Result r = run({"sample", "-o", out, "--size", "200x120"});
    ASSERT_EQ(0, r.status) << r.err;
    VCImage* image = load(out);
    ASSERT_NE(nullptr, image);
    EXPECT_EQ(200, image->width);
    EXPECT_EQ(120, image->height);
    // Top-left is the white bar, top-right the black one.
    EXPECT_EQ(255, image->data[0]);
    EXPECT_EQ(0, image->data[(199) * 4]);
    VCImage_destroy(image);
}

}  // namespace
