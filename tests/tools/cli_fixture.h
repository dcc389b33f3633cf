// Running the kivimaging program as a subprocess from a test, in a temporary
// folder of its own, with pictures to feed it.
#ifndef KIV_TESTS_TOOLS_CLI_FIXTURE_H
#define KIV_TESTS_TOOLS_CLI_FIXTURE_H

#include <android/log.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <string.h>
#include <sys/wait.h>

#include <filesystem>
#include <set>
#include <string>
#include <vector>

#include "support/image_ptr.h"
#include "support/log_capture.h"
#include "support/picture_streams.h"
#include "support/temp_dir.h"
#include "support/test_picture.h"
#include "vccore/vc_file.h"
#include "vccore/vc_picture.h"

struct CliResult {
    int status;
    std::string out, err;
};

// A picture file decoded to straight-alpha RGBA, or null.
inline ImagePtr loadPicture(const std::string& file) {
    ImagePtr image(VCImage_createEmpty(0, 0, VC_FORMAT_RGBA));
    if (VCImage_loadFromFile(image.get(), file.c_str()) != VC_OK) image.reset();
    return image;
}

// The file names in a folder, but for the fixture's own.
inline std::set<std::string> namesIn(const std::string& folder) {
    std::set<std::string> names;
    std::error_code absent;
    for (const auto& entry : std::filesystem::directory_iterator(folder, absent))
        names.insert(entry.path().filename().string());
    names.erase("stdout");
    names.erase("stderr");
    return names;
}

class CliTest : public ::testing::Test {
protected:
    void SetUp() override {
        // Suites ask the factory about effects themselves; keep their own log short.
        __android_log_set_minimum_priority(ANDROID_LOG_WARN);
        ASSERT_FALSE(mDir.path().empty());
    }

    std::string path(const std::string& name) const { return mDir.file(name); }
    bool exists(const std::string& name) const { return kivtest::fileExists(path(name)); }

    // Arguments are quoted for the shell; none of ours contains a quote.
    // `before` runs first in the same shell (a FIFO's writer, a umask).
    CliResult run(const std::vector<std::string>& args, const std::string& before = "") {
        std::string cmd = before + "'" KIVIMAGING_PROGRAM "'";
        for (const std::string& a : args) cmd += " '" + a + "'";
        cmd += " >'" + path("stdout") + "' 2>'" + path("stderr") + "' </dev/null";
        int raw = system(cmd.c_str());
        return {WIFEXITED(raw) ? WEXITSTATUS(raw) : 1000 + raw, kivtest::readText(path("stdout")),
                kivtest::readText(path("stderr"))};
    }

    // `image` as a PNG in the folder; its path.
    std::string writePng(const std::string& name, const VCImage& image) {
        EXPECT_TRUE(kivtest::writeFile(path(name), kivtest::encodePng(&image)));
        return path(name);
    }
    // A w x h PNG of the test picture, or of every pixel `flat` (RGBA).
    std::string writePng(const std::string& name, int w, int h, const uint8_t* flat = nullptr) {
        kivtest::Bytes pixels = kivtest::makeTestPicture(w, h, true);
        for (int i = 0; flat != nullptr && i < w * h; i++) memcpy(&pixels[i * 4], flat, 4);
        return writePng(name, *VCImageTest_wrap(pixels.data(), w, h, VC_FORMAT_RGBA));
    }

    kivtest::TempDir mDir;
    LogCapture mQuiet;
};

#endif
