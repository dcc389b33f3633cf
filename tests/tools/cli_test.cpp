// The kivimaging program end to end, run as a subprocess: exit codes and
// messages, the effect list, an effect applied to a file, the gallery.
#include <gtest/gtest.h>
#include <stdio.h>
#include <string.h>
#include <sys/stat.h>

#include <algorithm>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include "cli_fixture.h"
#include "effects.h"

namespace {

using Cli = CliTest;
using Result = CliResult;

TEST_F(Cli, UsageErrorsExitTwoWithAMessage) {
    std::string in = writePng("in.png", 16, 8);
    struct Case {
        std::vector<std::string> args;
        const char* message;
    } cases[] = {
        {{}, "Usage: kivimaging <command>"},
        {{"frobnicate"}, "unknown command 'frobnicate'"},
        {{"apply", in, "-o", path("o.png")}, "kivimaging apply: no effect given (-e)"},
        {{"apply", "-e", "403", "-o", path("o.png")}, "kivimaging apply: no input file given"},
        {{"apply", "-e", "403", in}, "kivimaging apply: no output given (-o)"},
        {{"apply", "-e", "404", in, "-o", path("o.png")}, "no effect has id 404"},
        {{"apply", "-e", "NoSuchLook", in, "-o", path("o.png")}, "unknown effect 'NoSuchLook'"},
        {{"apply", "-e", "403", in, "-o", path("o.bmp")}, "must end in .png, .jpg or .jpeg"},
        {{"apply", "-e", "403", "-q", "0", in, "-o", path("o.jpg")}, "--quality must be"},
        {{"apply", "-e", "403", in, "-o", in}, "would be overwritten by its result"},
        {{"gallery", in, "-o", in}, "would be overwritten by the contact sheet"},
        {{"gallery", in, "-o", path("./in.png")}, "would be overwritten by the contact sheet"},
        {{"apply", "-e", "403", in, in, "-o", path("d")}, "would both be written to 'in.png'"},
        {{"apply", "--bogus"}, "kivimaging apply: unknown option '--bogus'"},
        {{"gallery", "a.png", "b.png", "-o", path("g.png")}, "one input picture at most"},
        {{"gallery", "-o", path("g.png"), "--thumb", "8"}, "--thumb must be"},
        {{"sample", "-o", path("s.png"), "--size", "10x10"}, "--size must be"},
        {{"effects", "extra"}, "unexpected argument 'extra'"},
    };
    for (const Case& c : cases) {
        Result r = run(c.args);
        EXPECT_EQ(2, r.status) << c.message;
        EXPECT_NE(std::string::npos, r.err.find(c.message)) << "stderr: " << r.err;
        // A command's refusal points at its --help.
        if (c.args.size() > 1) {
            EXPECT_NE(std::string::npos, r.err.find("--help'")) << r.err;
        }
    }
    // Nothing was written by a refused command.
    EXPECT_FALSE(exists("o.png"));
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

TEST_F(Cli, EffectsListsWhatTheFactoryServes) {
    const std::vector<kivcli::EffectInfo> served = kivcli::effectList();
    ASSERT_FALSE(served.empty());
    Result r = run({"effects"});
    ASSERT_EQ(0, r.status) << r.err;
    std::istringstream lines(r.out);
    std::string line;
    std::getline(lines, line);
    EXPECT_NE(std::string::npos, line.find("CLASS"));
    size_t rows = 0;
    while (std::getline(lines, line)) {
        int id = 0, type = 0;
        char name[64] = {};
        if (sscanf(line.c_str(), "%d %63s %d", &id, name, &type) != 3) continue;
        ASSERT_LT(rows, served.size()) << line;
        // Row by row the effects the factory really serves, in id order.
        EXPECT_EQ(served[rows].id, id) << line;
        EXPECT_EQ(served[rows].className, name) << line;
        EXPECT_EQ(served[rows].filterType, type) << line;
        rows++;
    }
    EXPECT_EQ(served.size(), rows);
    EXPECT_NE(std::string::npos, r.out.find(std::to_string(served.size()) + " effects"));
}

TEST_F(Cli, NegativeInvertsEveryChannel) {
    const int w = 37, h = 21;
    std::string in = writePng("in.png", w, h);
    std::string out = path("neg.png");
    Result r = run({"apply", "-v", "-e", "403", in, "-o", out});
    ASSERT_EQ(0, r.status) << r.err;
    EXPECT_NE(std::string::npos, r.out.find("403 Negative: " + out)) << r.out;

    ImagePtr src = load(in);
    ImagePtr dst = load(out);
    ASSERT_NE(nullptr, src);
    ASSERT_NE(nullptr, dst);
    ASSERT_EQ(w, dst->width);
    ASSERT_EQ(h, dst->height);
    int worst = 0;
    for (int i = 0; i < w * h; i++) {
        for (int c = 0; c < 3; c++)
            worst = std::max(worst, abs(255 - src->data[i * 4 + c] - dst->data[i * 4 + c]));
        ASSERT_EQ(255, dst->data[i * 4 + 3]) << "alpha at pixel " << i;
    }
    EXPECT_LE(worst, 2) << "largest deviation from 255-x, in 1/255";
    // Not the identity: the input has dark and bright pixels alike.
    EXPECT_GT(abs(src->data[0] - dst->data[0]), 200);

    // The class name, in any case, selects the same effect. A JPEG result
    // replaces an existing (here larger) file instead of writing into it.
    const std::string jpeg = path("neg.jpg");
    std::ofstream(jpeg, std::ios::binary | std::ios::trunc) << std::string(1 << 20, 'x');
    r = run({"apply", "-e", "negative", "-p", "intensity=10", in, "-o", jpeg});
    ASSERT_EQ(0, r.status) << r.err;
    // Negative has no options: the parameter string is reported as ignored.
    EXPECT_NE(std::string::npos, r.err.find("403 Negative takes no parameters; -p is ignored"))
        << r.err;
    struct stat st;
    ASSERT_EQ(0, stat(jpeg.c_str(), &st));
    EXPECT_LT(st.st_size, 1 << 20) << "the old file's tail survived";
    ImagePtr again = load(jpeg);
    ASSERT_NE(nullptr, again);
    EXPECT_EQ(w, again->width);
}

TEST_F(Cli, GalleryGridAndCells) {
    // A flat colour, so that every thumbnail is flat too.
    const uint8_t colour[4] = {200, 100, 40, 255};
    std::string in = writePng("flat.png", 100, 50, colour);
    const std::vector<kivcli::EffectInfo> served = kivcli::effectList();
    ASSERT_FALSE(served.empty());

    std::string out = path("gallery.png");
    Result r = run({"gallery", in, "-o", out, "--thumb", "40", "--columns", "5", "-p", "x=1"});
    ASSERT_EQ(0, r.status) << r.err;
    // The parameter string reaches only the effects that take one; the rest are counted.
    int without = 0;
    for (const kivcli::EffectInfo& e : served)
        without += std::count(e.options.begin(), e.options.end(), "parameter") == 0;
    EXPECT_NE(std::string::npos,
              r.err.find("warning: " + std::to_string(without) + " of " +
                         std::to_string(served.size()) + " effects take no parameters"))
        << r.err;
    ImagePtr sheet = load(out);
    ASSERT_NE(nullptr, sheet);
    // Thumbnails 40x20; cells padded by 8 with a 13-pixel label row.
    int n = static_cast<int>(served.size());
    EXPECT_EQ(std::min(5, n) * (40 + 8) + 8, sheet->width);
    EXPECT_EQ((n + 4) / 5 * (20 + 13 + 8) + 8, sheet->height);
    for (int i = 0; i < n; i++) {
        const uint8_t* p =
            sheet->data + ((8 + (i / 5) * 41 + 10) * sheet->width + 8 + (i % 5) * 48 + 20) * 4;
        if (served[i].id == 400 || served[i].id == 403) {
            for (int c = 0; c < 3; c++) {
                int want = served[i].id == 400 ? colour[c] : 255 - colour[c];
                EXPECT_NEAR(want, p[c], 2) << "cell of " << served[i].id;
            }
        }
    }
}

TEST_F(Cli, SampleWritesTheTestPicture) {
    std::string out = path("sample.png");
    Result r = run({"sample", "-o", out, "--size", "200x120"});
    ASSERT_EQ(0, r.status) << r.err;
    ImagePtr image = load(out);
    ASSERT_NE(nullptr, image);
    EXPECT_EQ(200, image->width);
    EXPECT_EQ(120, image->height);
    // Top-left is the white bar, top-right the black one.
    EXPECT_EQ(255, image->data[0]);
    EXPECT_EQ(0, image->data[199 * 4]);
}

}  // namespace
