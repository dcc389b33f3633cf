// The kivimaging program with filter plug-ins installed under KIV_SYSROOT:
// listing them, and applying a GL and a CPU plug-in to a file.
#include <gtest/gtest.h>

#include <cstdlib>
#include <fstream>
#include <string>

#include "cli_fixture.h"
#include "support/plugin_sysroot.h"

namespace {

const char kDuotone[] = "com.example.duotone,libduotone.so";
const char kSolarize[] = "com.kiv.android.filter,libsolarize.so";

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
    // GL: strength 0 leaves the picture as it was, strength 100 does not.
    CliResult r = run({"apply", "-e", kDuotone, "-p", "strength=0", in, "-o", path("d0.png")});
    ASSERT_EQ(0, r.status) << r.err;
    EXPECT_EQ(std::string(kDuotone) + ": " + path("d0.png") + "\n", r.out);
    ASSERT_EQ(0, run({"apply", "-e", kDuotone, in, "-o", path("d100.png")}).status);
    ASSERT_EQ(
        0, run({"apply", "-e", kSolarize, "-p", "threshold=100", in, "-o", path("s.png")}).status);
    ImagePtr src = load(in), d0 = load(path("d0.png")), d100 = load(path("d100.png")),
             s = load(path("s.png"));
    ASSERT_TRUE(src && d0 && d100 && s);
    const size_t size = VCImage_size(src.get());
    ASSERT_EQ(size, VCImage_size(d0.get()));
    int same = 0, changed = 0;
    for (size_t i = 0; i < size; ++i) {
        same += std::abs(src->data[i] - d0->data[i]) <= 1;
        changed += std::abs(src->data[i] - d100->data[i]) > 8;
        // CPU: solarized on the CPU path, exactly.
        const int want = i % 4 != 3 && src->data[i] >= 100 ? 255 - src->data[i] : src->data[i];
        ASSERT_EQ(want, s->data[i]) << i;
    }
    EXPECT_EQ(int(size), same);
    EXPECT_GT(changed, int(size) / 4);
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
