// The kivimaging program: its own pieces (option parsing, numbers and sizes,
// the progress line, which library log lines count as failures), then the
// program end to end as a subprocess: exit codes and messages, the effect
// list and how -e is resolved, an effect applied to a file, and golden runs
// of the sample picture and the gallery's cells.
#include <android/log.h>
#include <gtest/gtest.h>
#include <stdio.h>
#include <stdlib.h>

#include <algorithm>
#include <set>
#include <string>
#include <vector>

#include "args.h"
#include "cli_fixture.h"
#include "cli_log.h"
#include "core/KivFilter.h"
#include "core/KivImaging.h"
#include "effects.h"
#include "font.h"
#include "live_stats.h"
#include "progress.h"
#include "support/look_reference.h"
#include "vccore/vc_error.h"
#include "vccore/vc_log.h"

namespace {

using namespace kivcli;

const OptionSpec kSpecs[] = {
    {'e', "effect", true}, {'o', "output", true}, {'v', "verbose", false}, {0, "thumb", true}};

bool parse(std::vector<const char*> argv, ParsedArgs* out, std::string* error) {
    argv.insert(argv.begin(), "cmd");
    return parseArgs(static_cast<int>(argv.size()), const_cast<char**>(argv.data()), 1, kSpecs, 4,
                     out, error);
}

TEST(Args, AcceptedAndRejectedForms) {
    ParsedArgs a;
    std::string error;
    ASSERT_TRUE(parse({"-e", "403", "in1.png", "--output=out", "-v", "--thumb", "64", "in2.jpg"},
                      &a, &error))
        << error;
    EXPECT_EQ("403 out 64 1", a.get("effect") + " " + a.get("output") + " " + a.get("thumb") + " " +
                                  std::to_string(a.has("verbose")));
    EXPECT_EQ(std::vector<std::string>({"in1.png", "in2.jpg"}), a.positionals);
    // The last value wins; after "--" everything is a file name; a value may
    // itself start with a dash.
    ParsedArgs b;
    ASSERT_TRUE(parse({"-eSepia", "-e", "Negative", "--", "-v", "-"}, &b, &error));
    EXPECT_EQ("Negative", b.get("effect"));
    EXPECT_FALSE(b.has("verbose"));
    EXPECT_EQ(std::vector<std::string>({"-v", "-"}), b.positionals);
    EXPECT_EQ("fallback", b.get("output", "fallback"));
    ParsedArgs c;
    ASSERT_TRUE(parse({"-e", "-1"}, &c, &error));
    EXPECT_EQ("-1", c.get("effect"));
    const struct {
        std::vector<const char*> argv;
        const char* message;
    } rejected[] = {
        {{"-x"}, "unknown option '-x'"},
        {{"--nope"}, "unknown option '--nope'"},
        {{"--nope=1"}, "unknown option '--nope'"},
        {{"-e"}, "option '--effect' needs a value"},
        {{"in.png", "--output"}, "option '--output' needs a value"},
        {{"--verbose=yes"}, "option '--verbose' takes no value"},
        {{"-vx"}, "option '-v' takes no value"},
    };
    for (const auto& r : rejected) {
        ParsedArgs d;
        EXPECT_FALSE(parse(r.argv, &d, &error)) << r.message;
        EXPECT_EQ(r.message, error);
    }
}

TEST(Args, NumbersAndSizes) {
    int v = -7;
    EXPECT_TRUE(parseInt("98", 1, 100, &v) && v == 98);
    EXPECT_TRUE(parseInt("-5", -10, 10, &v) && v == -5);
    v = 42;
    for (const char* bad : {"101", "0", "12abc", ""})
        EXPECT_FALSE(parseInt(bad, 1, 100, &v)) << bad;
    EXPECT_FALSE(parseInt("99999999999999999999", 1, 2147483647, &v));
    EXPECT_EQ(42, v);  // untouched on failure
    int w = 0, h = 0;
    EXPECT_TRUE(parseSize("640x480", 64, 8192, &w, &h) && w == 640 && h == 480);
    EXPECT_TRUE(parseSize("100X64", 64, 8192, &w, &h) && h == 64);
    for (const char* bad : {"640", "640x", "63x100", "640x480x2"})
        EXPECT_FALSE(parseSize(bad, 64, 8192, &w, &h)) << bad;
}

TEST(Progress, LineAndBar) {
    const std::string dots = std::string(30, '.');
    EXPECT_EQ("[" + dots + "] 0/4  a.png", progressLine(0, 4, "a.png"));
    EXPECT_EQ("[" + std::string(15, '#') + std::string(15, '.') + "] 2/4  b",
              progressLine(2, 4, "b"));
    // 9 of 30 cells for 3/10; the count is right-aligned to the width of "10/10".
    EXPECT_EQ("[" + std::string(9, '#') + std::string(21, '.') + "]  3/10",
              progressLine(3, 10, ""));
    EXPECT_EQ("[" + std::string(30, '#') + "] 10/10", progressLine(12, 10, nullptr));
    EXPECT_EQ("[" + dots + "] 0/1", progressLine(-3, 0, ""));
    // Long names keep their end, where the file name is.
    std::string longName = std::string(20, 'd') + "/" + std::string(29, 'f') + ".png";
    std::string line = progressLine(1, 1, longName.c_str());
    EXPECT_EQ("..." + longName.substr(longName.size() - 37), line.substr(line.size() - 40));
    // Drawn only when enabled, redrawn in place: a shorter line blanks the
    // first one's tail; the destructor ends the line.
    char* text = nullptr;
    size_t size = 0;
    FILE* out = open_memstream(&text, &size);
    ASSERT_NE(nullptr, out);
    ProgressBar(out, 3, false).update(1, "x");
    {
        ProgressBar bar(out, 2, true);
        bar.update(0, "long-name.png");
        bar.update(1, "b");
    }
    fclose(out);
    std::string got(text, size);
    free(text);
    const std::string first = progressLine(0, 2, "long-name.png"), second = progressLine(1, 2, "b");
    EXPECT_EQ("\r" + first + "\r" + second + std::string(first.size() - second.size(), ' ') + "\n",
              got);
}

// Error reports count as failures, from the image core's report function and
// from the Android log; error-level diagnostics and quieter reports do not.
TEST(CliLog, CountsErrorReportsOnly) {
    for (const char* report : {"VC_ERROR_UNKNOWN (-1): core/VFilterBufferedProcessorImpl:210",
                               "VC_ERROR_INVALID_STATE (-7): core/egl/EglImage:88"})
        EXPECT_TRUE(cliLogIsErrorReport(report)) << report;
    for (const char* other :
         {"EGL: lockGraphicBuffer format : 1, width : 960, stride : 960",
          "Input format 'NV21' is not a native format for EglImage: Conversion required to RGBA",
          "VC_ERROR_UNKNOWN", "  VC_ERROR_UNKNOWN (-1): x:1", ""})
        EXPECT_FALSE(cliLogIsErrorReport(other)) << other;
    EXPECT_FALSE(cliLogIsErrorReport(nullptr));
    cliLogSetup(false);
    const int before = cliLogErrorCount();
    VCError_report(VC_ERROR_IO_FAILED, "vccore/src/vc_image", 12);
    __android_log_print(ANDROID_LOG_ERROR, "KivImaging::EGL", "%s (%d): %s:%d",
                        "VC_ERROR_INVALID_STATE", -7, "core/VFilterBufferedProcessorImpl", 99);
    __android_log_print(ANDROID_LOG_ERROR, "KivImaging::EGL", "EGL: lockGraphicBuffer format : %x",
                        1);
    VF_LogMsg(VF_LOG_ERROR, "Encoding failed (%dx%d %4.4s)", 4, 4, "RGBA");
    VF_LogMsg(VF_LOG_DEBUG, "VC_ERROR_UNKNOWN (-1): %s:%d", "x", 1);
    __android_log_print(ANDROID_LOG_WARN, "KivImaging::EGL", "VC_ERROR_UNKNOWN (-1): x:1");
    EXPECT_EQ(before + 2, cliLogErrorCount());
}

TEST(LiveStats, IntervalsOfFramesThatFollowEachOtherAndTheSummaryLine) {
    LiveStats stats(2);
    // Frames 1-2 start no interval; 4 follows a frame the window dropped.
    const struct {
        uint64_t number;
        int64_t ms;
    } frames[] = {{1, 0}, {2, 1}, {3, 42}, {4, 83}, {6, 200}, {7, 240}, {8, 290}};
    for (const auto& f : frames) stats.add(f.number, f.ms * 1000000);
    EXPECT_EQ(stats.frames(), 7u);
    EXPECT_DOUBLE_EQ(stats.percentile(50), 41.0);  // of 41, 40, 41, 50
    EXPECT_DOUBLE_EQ(stats.percentile(99), 50.0);
    EXPECT_DOUBLE_EQ(LiveStats(0).percentile(50), 0.0);
    EXPECT_EQ(liveSummary(240, 3, 41.04, 43.96, 237, "out.mp4"),
              "frames: 240 rendered, 3 dropped; interval p50 41.0 ms, p99 44.0 ms; recorded 237 "
              "frames to out.mp4");
    EXPECT_EQ(liveSummary(5, 0, 0, 0, 0, ""),
              "frames: 5 rendered, 0 dropped; interval p50 0.0 ms, p99 0.0 ms");
}

using Cli = CliTest;
using kivtest::Bytes;

// Bad arguments exit 2 with their message; a live source or recording that
// cannot be opened exits 1. Nothing goes to standard output.
TEST_F(Cli, UsageErrorsExitTwoWithAMessage) {
    std::string in = writePng("in.png", 16, 8), o = path("o.png");
    const struct {
        std::vector<std::string> args;
        const char* message;
        int status = 2;
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
        {{"live", "--size", "15x10"}, "--size must be WxH, even sides from 16 to 4096"},
        {{"live", "--fps", "0"}, "--fps must be a number from 1 to 120"},
        {{"live", "--frames", "5", "--seconds", "1"}, "give --frames or --seconds, not both"},
        {{"live", "--record", "out.avi"}, "--record must name an .mp4 file"},
        {{"live", "--record-interval", "100"}, "--record-interval needs --record"},
        {{"live", "-o", "x.png"},
         "-o names the file of --picture-at or --snapshot-at, given before it"},
        {{"live", "--picture-at", "3"}, "--picture-at needs -o FILE after it"},
        {{"live", "--snapshot-at", "3", "-o", "x.bmp"}, "'x.bmp' must end in .png, .jpg or .jpeg"},
        {{"live", "-e", "NoSuchEffect"}, "NoSuchEffect"},
        {{"live", "--mode", "2"}, "--mode must be direct or fbo"},
        {{"live", "--record", "/nonexistent/out.mp4"},
         "kivimaging: cannot write the recording '/nonexistent/out.mp4'",
         1},
        {{"live", "--camera", "/nonexistent/clip.mkv"},
         "kivimaging: cannot play '/nonexistent/clip.mkv' as a video",
         1},
    };
    for (const auto& c : cases) {
        CliResult r = run(c.args);
        EXPECT_EQ(c.status, r.status) << c.message;
        EXPECT_NE(std::string::npos, r.err.find(c.message)) << "stderr: " << r.err;
        EXPECT_EQ("", r.out) << c.message;
        // A command's refusal points at its --help.
        EXPECT_TRUE(c.status != 2 || c.args.size() < 2 ||
                    r.err.find("--help'") != std::string::npos)
            << r.err;
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
    const std::vector<EffectInfo> served = effectList();
    ASSERT_FALSE(served.empty());
    size_t factory = 0;
    for (int id = 0; id < 1000; id++) {
        KivFilter* f = KivImaging_create(id, nullptr);
        factory += f != nullptr;
        if (f != nullptr) {
            auto it = std::find_if(served.begin(), served.end(),
                                   [&](const EffectInfo& e) { return e.id == id; });
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
        EffectChoice choice;
        std::string error;
        EXPECT_EQ(c.id != 0, effectResolve(c.arg, &choice, &error)) << c.arg;
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
    ImagePtr src = loadPicture(in), dst = loadPicture(out);
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
    ImagePtr jpeg = loadPicture(path("neg.jpg"));
    ASSERT_NE(nullptr, jpeg);
    EXPECT_EQ(w, jpeg->width);
}

// Golden pictures live in tests/tools/golden; with KIV_UPDATE_GOLDEN set they
// are written instead of compared (after a deliberate change, looked at by eye).
::testing::AssertionResult matchesGolden(const VCImage& got, const std::string& name,
                                         int tolerance) {
    const std::string file = std::string(KIV_TOOLS_GOLDEN_DIR "/") + name;
    if (getenv("KIV_UPDATE_GOLDEN") != nullptr) kivtest::writeFile(file, kivtest::encodePng(&got));
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
    ImagePtr image = loadPicture(path("sample.png"));
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
    const std::vector<EffectInfo> served = effectList();
    CliResult r =
        run({"gallery", "-o", path("gallery.png"), "--thumb", "48", "--columns", "5", "-p", "x=1"});
    ASSERT_EQ(0, r.status) << r.err;
    int without = 0;
    for (const EffectInfo& e : served)
        without += std::count(e.options.begin(), e.options.end(), "parameter") == 0;
    EXPECT_NE(std::string::npos,
              r.err.find("warning: " + std::to_string(without) + " of " +
                         std::to_string(served.size()) + " effects take no parameters"))
        << r.err;
    ImagePtr sheet = loadPicture(path("gallery.png"));
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
    EXPECT_EQ(0, fontMalformedGlyphs());
    std::set<std::string> seen;
    for (char c = ' '; c <= '~'; c++) {
        std::string bits;
        for (int i = 0; i < kGlyphWidth * kGlyphHeight; i++)
            bits += fontGlyphPixel(c, i % kGlyphWidth, i / kGlyphWidth) ? '#' : '.';
        EXPECT_EQ(c == ' ', bits.find('#') == std::string::npos) << c;
        EXPECT_TRUE(seen.insert(bits).second) << "glyph of '" << c << "' repeats another";
    }
}

}  // namespace
