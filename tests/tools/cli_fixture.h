// Running the kivimaging program as a subprocess from a test, in a
// temporary folder of its own, with pictures to feed it.
#ifndef KIV_TESTS_TOOLS_CLI_FIXTURE_H
#define KIV_TESTS_TOOLS_CLI_FIXTURE_H

#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/wait.h>

#include <string>
#include <vector>

#include <android/log.h>

#include "support/image_ptr.h"
#include "support/log_capture.h"
#include "support/temp_dir.h"
#include "vccore/vc_file.h"
#include "vccore/vc_picture.h"

struct CliResult {
    int status;
    std::string out;
    std::string err;
};

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

    // A w×h PNG; with `flat` null its channels vary independently, else
    // every pixel is `flat` (RGBA).
    std::string writePng(const std::string& name, int w, int h, const uint8_t* flat = nullptr) {
        ImagePtr image(VCImage_createNew(w, h, VC_FORMAT_RGBA));
        EXPECT_NE(nullptr, image);
        for (int y = 0; y < h; y++) {
            for (int x = 0; x < w; x++) {
                uint8_t* p = image->data + (y * w + x) * 4;
                p[0] = flat ? flat[0] : static_cast<uint8_t>(x * 255 / (w - 1));
                p[1] = flat ? flat[1] : static_cast<uint8_t>(y * 255 / (h - 1));
                p[2] = flat ? flat[2] : static_cast<uint8_t>((x * 7 + y * 13) & 0xff);
                p[3] = flat ? flat[3] : 255;
            }
        }
        size_t length = 0;
        unsigned char* png = VCPicture_encodePng(image.get(), &length);
        EXPECT_NE(nullptr, png);
        std::string file = path(name);
        EXPECT_TRUE(kivtest::writeFile(file, kivtest::Bytes(png, png + length)));
        free(png);
        return file;
    }

    // A picture file decoded to straight-alpha RGBA, or null.
    static ImagePtr load(const std::string& file) {
        ImagePtr image(VCImage_createEmpty(0, 0, VC_FORMAT_RGBA));
        if (VCImage_loadFromFile(image.get(), file.c_str()) != VC_OK) image.reset();
        return image;
    }

    kivtest::TempDir mDir;
    LogCapture mQuiet;
};

#endif
