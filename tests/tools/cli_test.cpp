// The kivimaging program end to end, run as a subprocess: exit codes and
// messages, the effect list and how -e is resolved, an effect applied to a
// file, and golden runs of the sample picture and the gallery's cells.
#include <gtest/gtest.h>
#include <stdio.h>

#include <algorithm>
#include <set>
#include <string>
#include <vector>

#include "cli_fixture.h"
#include "core/KivFilter.h"
#include "core/KivImaging.h"
#include "effects.h"
#include "font.h"
#include "support/look_reference.h"

namespace {

using Cli = CliTest;
using kivtest::Bytes;

TEST_F(Cli, UsageErrorsExitTwoWithAMessage) {
    std::string in = writePng("in.png", 16, 8), o = path("o.png");
    const struct {
        std::vector<std::string> args;
        const char* message;
    } cases[] = {
        {{}, "Usage: kivimaging <command>"},
        {{"frobnicate"}, "unknown command 'frobnicate'"},
        {{"apply", in, "-o", o}, "kivimaging apply: no effect given (-e)"},
        {{"apply", "-e", "403", "-o", o}, "kivimaging apply: no input file given"},
        {{"apply", "-e", "403", in}, "kivimaging apply: no output given (-o)"},
        {{"apply", "-e", "404", in, "-o", o}, "no effect has id 404"},
        {{"apply", "-e", "NoSuchLook", in, "-o", o}, "unknown effect 'NoSuchLook'"},
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
    for (const auto& c : cases) {
        CliResult r = run(c.args);
        EXPECT_EQ(2, r.status) << c.message;
        EXPECT_NE(std::string::npos, r.err.find(c.message)) << "stderr: " << r.err;
        // A command's refusal points at its --help.
        EXPECT_TRUE(c.args.size() < 2 || r.err.find("--help'") != std::string::npos) << r.err;
    }
    EXPECT_FALSE(exists("o.png"));  // nothing was written by a refused command
    for (const char* command : {"effects", "apply", "gallery", "sample"}) {
        CliResult r = run({command, "--help"});
        EXPECT_EQ(0, r.status) << command;
        EXPECT_EQ(0u, r.out.find(std::string("Usage: kivimaging ") + command)) << r.out;
        EXPECT_EQ(r.out, run({"help", command}).out);
    }
    EXPECT_NE(std::string::npos, run({"--help"}).out.find("gallery"));
}

// The list is the factory's, row by row in id order; -e takes an id, a class
// name in any case, or a filter-library name the catalog maps to an effect.
TEST_F(Cli, EffectsAreTheFactorysAndResolveByIdOrName) {
    const std::vector<kivcli::EffectInfo> served = kivcli::effectList();
    ASSERT_FALSE(served.empty());
    size_t factory = 0;
    for (int id = 0; id < 1000; id++) {
        KivFilter* f = KivImaging_create(id, nullptr);
        factory += f != nullptr;
        if (f != nullptr) {
            auto it = std::find_if(served.begin(), served.end(),
                                   [&](const kivcli::EffectInfo& e) { return e.id == id; });
            EXPECT_TRUE(it != served.end() && it->filterType == f->getFilterType() &&
                        static_cast<int>(it->options.size()) == KivImaging_getOptionsCount(f))
                << id;
        }
        KivImaging_destroy(f);
    }
    EXPECT_EQ(factory, served.size());
    // The listing itself: a golden run (see matchesGolden).
    CliResult r = run({"effects"});
    ASSERT_EQ(0, r.status) << r.err;
    const std::string golden = KIV_TOOLS_GOLDEN_DIR "/effects.txt";
    if (getenv("KIV_UPDATE_GOLDEN") != nullptr) {
        kivtest::writeFile(golden, Bytes(r.out.begin(), r.out.end()));
    }
    EXPECT_EQ(kivtest::readText(golden), r.out);

    const std::string film = "com.morvane.android.provider.filterprovider,libfilm.so";
    const struct {
        std::string arg;
        int id;
        std::string labelOrError;
    } resolve[] = {
        {"403", 403, "403 Negative"},
        {"sEpIa", 401, "401 Sepia"},
        {film, -1, film},
        {"404", 0, "no effect has id 404 (see 'kivimaging effects')"},
        {"2000", 0, "no effect has id 2000 (see 'kivimaging effects')"},
        {"Sepiaa", 0, "unknown effect 'Sepiaa' (see 'kivimaging effects')"},
        {"", 0, "empty effect name"},
    };
    for (const auto& c : resolve) {
        kivcli::EffectChoice choice;
        std::string error;
        EXPECT_EQ(c.id != 0, kivcli::effectResolve(c.arg, &choice, &error)) << c.arg;
        EXPECT_EQ(c.labelOrError, c.id != 0 ? choice.label : error);
        EXPECT_EQ(c.id != 0 ? c.id : -1, choice.id) << c.arg;
        EXPECT_EQ(c.id == -1 ? film : "", choice.library) << c.arg;
    }
}

TEST_F(Cli, NegativeInvertsEveryChannel) {
    const int w = 37, h = 21;
    std::string in = writePng("in.png", w, h), out = path("neg.png");
    CliResult r = run({"apply", "-v", "-e", "403", in, "-o", out});
    ASSERT_EQ(0, r.status) << r.err;
    EXPECT_NE(std::string::npos, r.out.find("403 Negative: " + out)) << r.out;
    ImagePtr src = load(in), dst = load(out);
    ASSERT_TRUE(src && dst);
    ASSERT_EQ(w * 100 + h, dst->width * 100 + dst->height);
    const lookref::Picture picture(w, h, VCImageTest_bytes(*src));
    EXPECT_LE(
        VCImageTest_maxDifference(lookref::render(403, picture, nullptr), VCImageTest_bytes(*dst)),
        2);
    // The class name selects the same effect; -p is refused by an effect without options.
    r = run({"apply", "-e", "negative", "-p", "intensity=10", in, "-o", path("neg.jpg")});
    ASSERT_EQ(0, r.status) << r.err;
    EXPECT_NE(std::string::npos, r.err.find("403 Negative takes no parameters; -p is ignored"));
    ImagePtr jpeg = load(path("neg.jpg"));
    ASSERT_NE(nullptr, jpeg);
    EXPECT_EQ(w, jpeg->width);
}

// Golden pictures live in tests/tools/golden; with KIV_UPDATE_GOLDEN set they
// are written instead of compared (after a deliberate change, looked at by eye).
::testing::AssertionResult matchesGolden(const VCImage& got, const std::string& name,
                                         int tolerance) {
    const std::string file = std::string(KIV_TOOLS_GOLDEN_DIR "/") + name;
    if (getenv("KIV_UPDATE_GOLDEN") != nullptr) {
        size_t length = 0;
        unsigned char* png = VCPicture_encodePng(&got, &length);
        kivtest::writeFile(file, Bytes(png, png + length));
        free(png);
    }
    ImagePtr want = loadPicture(file);
    if (want == nullptr) return ::testing::AssertionFailure() << "no golden " << file;
    if (want->width != got.width || want->height != got.height)
        return ::testing::AssertionFailure() << got.width << "x" << got.height << ", golden "
                                             << want->width << "x" << want->height;
    for (uint32_t i = 0; i < VCImage_size(&got); ++i)
        if (abs(want->data[i] - got.data[i]) > tolerance)
            return ::testing::AssertionFailure()
                   << name << ": pixel " << i / 4 % got.width << "," << i / 4 / got.width
                   << " channel " << i % 4 << " is " << int(got.data[i]) << ", golden "
                   << int(want->data[i]);
    return ::testing::AssertionSuccess();
}

// FFmpeg and the hundred-odd libraries it needs are opened only for video:
// pictures go through without them, in the program and in the library.
TEST_F(Cli, PicturesNeedNoVideoLibraries) {
    writePng("in.png", 64, 48);
    CliResult r =
        run({"apply", "-e", "Sepia", path("in.png"), "-o", path("out.png")}, "LD_DEBUG=files ");
    ASSERT_EQ(0, r.status) << r.err;
    EXPECT_NE(std::string::npos, r.err.find("file=libEGL.so")) << "no loader trace";
    EXPECT_EQ(std::string::npos, r.err.find("libavcodec"));
    EXPECT_EQ(std::string::npos, r.err.find("libkivhostvideo"));
    FILE* ldd = popen("ldd '" KIV_LIBRARY_FILE "'", "r");
    ASSERT_NE(nullptr, ldd);
    std::string needed;
    char line[512];
    while (fgets(line, sizeof(line), ldd) != nullptr) needed += line;
    EXPECT_EQ(0, pclose(ldd));
    EXPECT_NE(std::string::npos, needed.find("libEGL.so")) << needed;
    EXPECT_EQ(std::string::npos, needed.find("libav")) << needed;
}

// The sample picture: eight colour bars, grey and hue ramps, one-pixel
// stripes and checkerboard, skin tones and primary ramps, opaque, exactly.
TEST_F(Cli, GoldenSamplePicture) {
    CliResult r = run({"sample", "-o", path("sample.png"), "--size", "320x240"});
    ASSERT_EQ(0, r.status) << r.err;
    ImagePtr image = load(path("sample.png"));
    ASSERT_NE(nullptr, image);
    EXPECT_TRUE(matchesGolden(*image, "sample_320x240.png", 0));
    // Below 64 pixels a side there is no sample.
    EXPECT_EQ(2, run({"sample", "-o", path("tiny.png"), "--size", "63x100"}).status);
}

// The gallery of the built-in sample: a grid of 48-pixel thumbnails padded by
// 8 with a 13-pixel label row, the parameter text handed only to effects that
// take one; the cells of NoEffect and Negative (thumbnail, and label cut to
// the cell's width) match their golden crops.
TEST_F(Cli, GoldenGalleryCells) {
    const std::vector<kivcli::EffectInfo> served = kivcli::effectList();
    CliResult r =
        run({"gallery", "-o", path("gallery.png"), "--thumb", "48", "--columns", "5", "-p", "x=1"});
    ASSERT_EQ(0, r.status) << r.err;
    int without = 0;
    for (const kivcli::EffectInfo& e : served)
        without += std::count(e.options.begin(), e.options.end(), "parameter") == 0;
    EXPECT_NE(std::string::npos,
              r.err.find("warning: " + std::to_string(without) + " of " +
                         std::to_string(served.size()) + " effects take no parameters"))
        << r.err;
    ImagePtr sheet = load(path("gallery.png"));
    ASSERT_NE(nullptr, sheet);
    const int n = static_cast<int>(served.size()), thumbH = 32, cellW = 48 + 8,
              cellH = thumbH + 13 + 8;
    ASSERT_EQ(std::min(5, n) * cellW + 8, sheet->width);
    ASSERT_EQ((n + 4) / 5 * cellH + 8, sheet->height);
    for (int i = 0; i < n; i++) {
        if (served[i].id != 400 && served[i].id != 403) continue;
        // The cell with its padding on every side: nothing may spill into it.
        Bytes crop;
        const int x0 = (i % 5) * cellW, y0 = (i / 5) * cellH;
        for (int y = y0; y < y0 + cellH + 8; y++)
            crop.insert(crop.end(), sheet->data + (y * sheet->width + x0) * 4,
                        sheet->data + (y * sheet->width + x0 + cellW + 8) * 4);
        EXPECT_TRUE(
            matchesGolden(*VCImageTest_wrap(crop.data(), cellW + 8, cellH + 8, VC_FORMAT_RGBA),
                          "gallery_cell_" + std::to_string(served[i].id) + ".png", 2));
    }
}

// What a golden label cannot show of the font: every printable character has
// a glyph of its own, none empty but the space's, none malformed.
TEST(CliFont, EveryPrintableCharacterHasItsOwnGlyph) {
    EXPECT_EQ(0, kivcli::fontMalformedGlyphs());
    std::set<std::string> seen;
    for (char c = ' '; c <= '~'; c++) {
        std::string bits;
        for (int i = 0; i < kivcli::kGlyphWidth * kivcli::kGlyphHeight; i++)
            bits += kivcli::fontGlyphPixel(c, i % kivcli::kGlyphWidth, i / kivcli::kGlyphWidth)
                        ? '#'
                        : '.';
        EXPECT_EQ(c == ' ', bits.find('#') == std::string::npos) << c;
        EXPECT_TRUE(seen.insert(bits).second) << "glyph of '" << c << "' repeats another";
    }
}

}  // namespace
