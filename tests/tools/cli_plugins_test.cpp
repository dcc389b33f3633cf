// The kivimaging program with filter plug-ins installed under KIV_SYSROOT:
// listing them, and applying a GL and a CPU plug-in to a file.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <fstream>
#include <string>

#include "cli_fixture.h"
#include "support/plugin_sysroot.h"

namespace {

const char kDuotone[] = "com.example.duotone,libduotone.so";
const char kSolarize[] = "com.kiv.android.filter,libsolarize.so";

// Duotone's math written again: luma picks a gradient entry (stops at 0, 128
// and 255), mixed with the picture by the strength.
kivtest::Bytes duotone(const VCImage& rgba, double strength) {
    static const int stops[3][3] = {{25, 20, 70}, {200, 80, 90}, {255, 235, 170}};
    kivtest::Bytes out = VCImageTest_bytes(rgba);
    for (size_t p = 0; p < out.size(); p += 4) {
        const uint8_t* c = &out[p];
        const int i = std::min(255, int(0.299 * c[0] + 0.587 * c[1] + 0.114 * c[2] + 0.5));
        const int run = i < 128 ? 0 : 1;
        const double t = run == 0 ? i / 128.0 : (i - 128) / 127.0;
        for (int k = 0; k < 3; ++k) {
            const double tone =
                std::lround(stops[run][k] + (stops[run + 1][k] - stops[run][k]) * t);
            out[p + k] = uint8_t(std::lround(c[k] + (tone - c[k]) * strength));
        }
    }
    return out;
}

class CliPlugins : public CliTest {
protected:
    void SetUp() override {
        CliTest::SetUp();
        ASSERT_TRUE(mRoot.ok());  // KIV_SYSROOT, inherited by the program
        mRoot.install(KIV_EXAMPLE_DUOTONE, "com.example.duotone", "libduotone.so");
        mRoot.install(KIV_EXAMPLE_SOLARIZE, "com.kiv.android.filter", "libsolarize.so", true);
        // In the preload folder, but its package is looked for in the download one.
        mRoot.install(KIV_EXAMPLE_SOLARIZE, "com.example.lost", "libsolarize.so", true);
        std::ofstream(mRoot.downloadLib() + "notes.txt") << "not a library";
    }
    PluginSysroot mRoot;
};

TEST_F(CliPlugins, ListsWhatIsInstalled) {
    CliResult r = run({"effects", "--plugins"});
    EXPECT_EQ(0, r.status) << r.err;
    for (const std::string& want :
         {std::string("com.example.duotone,libduotone.so            Duotone          GL     -\n"),
          std::string("com.kiv.android.filter,libsolarize.so        Solarize         CPU    RGBA "
                      "BGRA NV21 NV12\n"),
          "com.example.lost,libsolarize.so              (not usable: cannot be loaded from " +
              mRoot.preloadLib() + "com.example.lost.libsolarize.so; -v tells why)\n",
          "(not usable: not a filter library name: " + mRoot.downloadLib() + "notes.txt)\n",
          std::string("2 plug-ins, 2 files not usable\n")})
        EXPECT_NE(std::string::npos, r.out.find(want)) << want << "in:\n" << r.out;
}

TEST_F(CliPlugins, AppliesGlAndCpuPlugins) {
    const std::string in = path("in.png");
    ASSERT_EQ(0, run({"sample", "-o", in, "--size", "96x64"}).status);
    // GL: the gradient mixed in by the strength given (tolerance 3: a luma on
    // a texel boundary may pick the neighbouring entry, plus rounding).
    CliResult r = run({"apply", "-e", kDuotone, "-p", "strength=50", in, "-o", path("d50.png")});
    ASSERT_EQ(0, r.status) << r.err;
    EXPECT_EQ(std::string(kDuotone) + ": " + path("d50.png") + "\n", r.out);
    ASSERT_EQ(0, run({"apply", "-e", kDuotone, in, "-o", path("d100.png")}).status);
    ASSERT_EQ(
        0, run({"apply", "-e", kSolarize, "-p", "threshold=100", in, "-o", path("s.png")}).status);
    ImagePtr src = loadPicture(in), d50 = loadPicture(path("d50.png")),
             d100 = loadPicture(path("d100.png")), s = loadPicture(path("s.png"));
    ASSERT_TRUE(src && d50 && d100 && s);
    EXPECT_LE(VCImageTest_maxDifference(duotone(*src, 0.5), VCImageTest_bytes(*d50)), 3);
    EXPECT_LE(VCImageTest_maxDifference(duotone(*src, 1.0), VCImageTest_bytes(*d100)), 3);
    // CPU: solarized on the CPU path, exactly.
    for (size_t i = 0; i < VCImage_size(src.get()); ++i) {
        const int want = i % 4 != 3 && src->data[i] >= 100 ? 255 - src->data[i] : src->data[i];
        ASSERT_EQ(want, s->data[i]) << i;
    }
    // A name whose library is not there, and one that is refused.
    for (const char* name : {"com.example.nothing,libduotone.so", "com.example,../libduotone.so"}) {
        r = run({"apply", "-e", name, in, "-o", path("x.png")});
        EXPECT_EQ(2, r.status) << name;
        EXPECT_NE(std::string::npos,
                  r.err.find(std::string("no filter library '") + name + "' could be loaded"))
            << r.err;
    }
}

}  // namespace
