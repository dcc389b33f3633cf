// On a Qualcomm msm8974 board the processor switches the 8K texture mode on
// around each draw and logs the maximum texture size both ways. Mesa does not
// know the switch (it records GL_INVALID_ENUM), which must not disturb the
// draw. Its own program: the platform is detected once per process.
#include <gtest/gtest.h>

#include <GLES2/gl2.h>

#include <cstdlib>
#include <string>
#include <vector>

#include "core/VFilterBufferedProcessorImpl.h"
#include "core/egl/Platform.h"
#include "support/log_capture.h"
#include "vccore/vc_image.h"

TEST(BufferedProcessorMsm8974, EightKTexturesAroundEachDraw) {
    setenv("KIV_PROP_ro_board_platform", "msm8974", 1);
    ASSERT_EQ(6, static_cast<int>(Platform::getCurrentPlatform()));
    VFilterBufferedProcessorImpl p;
    p.initialize();
    p.setEffect(403);
    GLint maxSize = 0;
    {
        LogCapture quiet;
        ASSERT_EQ(0, p.bindGLEnvironment());
        glGetIntegerv(GL_MAX_TEXTURE_SIZE, &maxSize);
        p.unbindGLEnvironment();
    }
    ASSERT_GT(maxSize, 0);
    std::vector<uint8_t> in(4 * 4 * 4, 40), out(4 * 4 * 4, 0);
    LogCapture log;
    ASSERT_EQ(0, p.doProcessRGBA(in.data(), 4, 4, out.data(), VC_FORMAT_RGBA));
    const std::string size = std::to_string(maxSize);
    EXPECT_EQ(1u,
              log.count("EGL: Enable GL_ENABLE_8K_TEXTURES_AND_RENDERING_QCOM, size = " + size));
    EXPECT_TRUE(
        log.contains(4, "EGL: Disable GL_ENABLE_8K_TEXTURES_AND_RENDERING_QCOM, size = " + size));
    // Enable comes before the draw, disable after it.
    std::vector<std::string> lines = log.texts();
    size_t enable = lines.size(), wait = lines.size(), disable = lines.size();
    for (size_t i = 0; i < lines.size(); ++i) {
        if (lines[i].rfind("EGL: Enable GL_ENABLE_8K", 0) == 0) enable = i;
        if (lines[i] == "EGL: Synchronously waiting for rendering...") wait = i;
        if (lines[i].rfind("EGL: Disable GL_ENABLE_8K", 0) == 0) disable = i;
    }
    EXPECT_LT(enable, wait);
    EXPECT_LT(wait, disable);
    EXPECT_LT(disable, lines.size());
    EXPECT_EQ(215, out[0]);  // the negative look still ran

    // The switch is let go only where it was switched on: also by a call that
    // fails after binding (a picture no buffer can hold), never by one that
    // is refused before it (odd NV21 that cannot be padded).
    auto switches = [&](const char* prefix) {
        return log.countPrefix(std::string("EGL: ") + prefix + " GL_ENABLE_8K_TEXTURES");
    };
    for (int call = 0; call < 2; ++call) {
        log.clear();
        int result = call == 0 ? p.doProcessRGBA(in.data(), 0, 0, out.data(), VC_FORMAT_BGRA)
                               : p.doProcessNV21(in.data(), -3, 5, out.data());
        EXPECT_EQ(call == 0 ? 0 : -7, result);
        EXPECT_EQ(switches("Enable"), switches("Disable")) << call;
        EXPECT_EQ(call == 0 ? 1u : 0u, switches("Disable")) << call;
    }
    p.release();
}
