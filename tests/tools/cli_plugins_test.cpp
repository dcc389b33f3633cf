// The kivimaging program with filter plug-ins installed under KIV_SYSROOT:
// listing them, and applying a GL and a CPU plug-in to a file.
#include <gtest/gtest.h>
#include <stdio.h>
#include <stdlib.h>
#include <sys/wait.h>

#include <fstream>
#include <string>
#include <vector>

#include "support/image_ptr.h"
#include "support/plugin_sysroot.h"
#include "support/temp_dir.h"
#include "vccore/vc_file.h"
#include "vccore/vc_image.h"

namespace {

struct Result {
    int status;
    std::string out;
    std::string err;
};

class CliPlugins : public ::testing::Test {
protected:
    void SetUp() override {
        ASSERT_TRUE(mRoot.ok());
        mRoot.install(KIV_EXAMPLE_DUOTONE, "com.example.duotone", "libduotone.so");
        mRoot.install(KIV_EXAMPLE_SOLARIZE, "com.kiv.android.filter", "libsolarize.so", true);
        // In the preload folder, but its package is looked for in the download one.
        mRoot.install(KIV_EXAMPLE_SOLARIZE, "com.example.lost", "libsolarize.so", true);
        std::ofstream(mRoot.downloadLib() + "notes.txt") << "not a library";
    }
    std::string path(const std::string& name) const { return mRoot.root() + "/" + name; }
    // Runs the program; KIV_SYSROOT is inherited from this process.
    Result run(const std::string& args) {
        std::string cmd = "'" KIVIMAGING_PROGRAM "' " + args + " >'" + path("stdout") + "' 2>'" +
                          path("stderr") + "' </dev/null";
        int raw = system(cmd.c_str());
        return {WIFEXITED(raw) ? WEXITSTATUS(raw) : 1000 + raw, kivtest::readText(path("stdout")),
                kivtest::readText(path("stderr"))};
    }
    ImagePtr load(const std::string& file) {
        ImagePtr image(VCImage_createEmpty(0, 0, VC_FORMAT_RGBA));
        EXPECT_EQ(VC_OK, VCImage_loadFromFile(image.get(), file.c_str())) << file;
        return image;
    }
    PluginSysroot mRoot;
};

TEST_F(CliPlugins, ListsWhatIsInstalled) {
    Result r = run("effects --plugins");
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
    ASSERT_EQ(0, run("sample -o '" + path("in.png") + "' --size 96x64").status);
    ImagePtr in = load(path("in.png"));
    // GL: strength 0 leaves the picture as it was, strength 100 does not.
    Result r = run("apply -e com.example.duotone,libduotone.so -p strength=0 '" + path("in.png") +
                   "' -o '" + path("d0.png") + "'");
    ASSERT_EQ(0, r.status) << r.err;
    EXPECT_EQ("com.example.duotone,libduotone.so: " + path("d0.png") + "\n", r.out);
    ASSERT_EQ(0, run("apply -e com.example.duotone,libduotone.so '" + path("in.png") + "' -o '" +
                     path("d100.png") + "'")
                     .status);
    ImagePtr d0 = load(path("d0.png"));
    ImagePtr d100 = load(path("d100.png"));
    const size_t size = VCImage_size(in.get());
    ASSERT_EQ(size, VCImage_size(d0.get()));
    int same = 0, changed = 0;
    for (size_t i = 0; i < size; ++i) {
        same += std::abs(in->data[i] - d0->data[i]) <= 1;
        changed += std::abs(in->data[i] - d100->data[i]) > 8;
    }
    EXPECT_EQ(int(size), same);
    EXPECT_GT(changed, int(size) / 4);
    // CPU: solarized on the CPU path, exactly.
    ASSERT_EQ(0, run("apply -e com.kiv.android.filter,libsolarize.so -p threshold=100 '" +
                     path("in.png") + "' -o '" + path("s.png") + "'")
                     .status);
    ImagePtr s = load(path("s.png"));
    for (size_t i = 0; i < size; ++i) {
        const int want = i % 4 != 3 && in->data[i] >= 100 ? 255 - in->data[i] : in->data[i];
        ASSERT_EQ(want, s->data[i]) << i;
    }
    // A name whose library is not there, and one that is refused.
    for (const char* name : {"com.example.nothing,libduotone.so", "com.example,../libduotone.so"}) {
        r = run(std::string("apply -e '") + name + "' '" + path("in.png") + "' -o '" +
                path("x.png") + "'");
        EXPECT_EQ(2, r.status) << name;
        EXPECT_NE(std::string::npos,
                  r.err.find(std::string("no filter library '") + name + "' could be loaded"))
            << r.err;
    }
}

}  // namespace
