// The geometric effects: their pictures through the buffered processor at odd
// and even sizes against the CPU statement of their sampling (Ripple and
// DistortionCorrection at several frames), DistortionCorrection's option and
// animation, and every camera orientation. Load failures and GL objects: effect_gl_test.
#include <gtest/gtest.h>

#include <cmath>
#include <memory>
#include <string>
#include <vector>

#include "core/KivImaging.h"
#include "core/egl/EglProgram.h"
#include "core/filters/sce/geometricEffects.h"
#include "support/effect_renderer.h"
#include "support/gl_context.h"
#include "support/log_capture.h"
#include "support/look_reference.h"
#include "support/processor_ptr.h"
#include "vccore/vc_log.h"

namespace {

// Colours differ from the CPU by llvmpipe's mediump arithmetic (1/255, 2 in
// Embossed's nine-term sums); positions the shaders compute in mediump may be
// off by about 2^-11 of the texture, which at a sharp edge moves a colour a
// long way, so the expected range covers the colours within 1/1024 of the
// exact sample position.
constexpr int kTolerance = 2;
constexpr float kSlack = 1.0f / 1024;

struct Draw {
    int id;
    int width, height;
    const char* parameter;    // handed over before the first frame
    std::vector<int> frames;  // compared after these frame counts (1 = the first)
};

void PrintTo(const Draw& d, std::ostream* os) {
    *os << d.id << " " << d.width << "x" << d.height << " \"" << d.parameter << "\"";
}

// What the effect's state is after n frames, for the CPU statement.
float rippleTime(int frames) {
    return 0.04f * frames;
}
// DistortionCorrection from 0 towards a target: 0.075 a frame, the last step
// taken whole once within 0.075.
float easedLevel(float target, int frames) {
    float level = 0.0f;
    for (int i = 0; i < frames; ++i) {
        float stepped = level + (target > level ? 0.075f : -0.075f);
        level = std::fabs(target - stepped) <= 0.075f ? target : stepped;
    }
    return level;
}

class GeometricThroughProcessor : public ::testing::TestWithParam<Draw> {};

TEST_P(GeometricThroughProcessor, MatchesTheCpuSampling) {
    const Draw& d = GetParam();
    LogCapture quiet;
    ProcessorPtr processor = ProcessorTest_create();
    ASSERT_EQ(0, processor->setEffect(d.id));
    processor->setEffectParameter(d.parameter);
    lookref::Picture picture(d.width, d.height, lookref::makeTestPicture(d.width, d.height, false));
    std::vector<uint8_t> out(size_t(d.width) * d.height * 4);
    int drawn = 0;
    // The target level of DistortionCorrection's texts below.
    const float target =
        d.id == 447 ? static_cast<DistortionCorrection*>(processor->getEffect())->getTargetLevel()
                    : 0.0f;
    for (int frame : d.frames) {
        while (drawn < frame) {
            ASSERT_EQ(0, processor->doProcessRGBA(picture.rgba().data(), d.width, d.height,
                                                  out.data(), VC_FORMAT_RGBA));
            ++drawn;
        }
        lookref::expectWithin(lookref::renderGeometric(d.id, picture, rippleTime(frame),
                                                       easedLevel(target, frame), kSlack),
                              out.data(), kTolerance, "frame " + std::to_string(frame));
    }
}

// A rectangle right of centre: level 1 (DistortionCorrection) after 13 frames.
const char kRightSide[] = "FA=1,LE=600,RI=1000,TO=-200,BO=200";

// clang-format off
INSTANTIATE_TEST_SUITE_P(Sizes, GeometricThroughProcessor, ::testing::Values(
    Draw{445, 61, 47, "", {1}}, Draw{444, 61, 47, "", {1, 2, 5}}, Draw{441, 61, 47, "", {1}},
    Draw{417, 61, 47, "", {1}}, Draw{417, 40, 64, "", {1}}, Draw{417, 96, 48, "", {1}},
    // 64x48 is narrower than 16:9 (stronger correction), 96x48 wider.
    Draw{447, 64, 48, kRightSide, {1, 5, 13, 14}}, Draw{447, 96, 48, kRightSide, {2, 13}},
    Draw{447, 61, 47, "FA=1,LE=0,RI=0,TO=400,BO=400", {4}}),
    [](const ::testing::TestParamInfo<Draw>& info) {
        return std::to_string(info.param.id) + "_" + std::to_string(info.index);
    });
// clang-format on

TEST(DistortionCorrection, TextsSetTheTargetLevel) {
    struct Row {
        const char* text;
        float level;  // -1: unchanged
    } rows[] = {
        {"FA=1,LE=-1000,RI=1000,TO=-1000,BO=1000", 0.0f},  // centred: no correction
        {kRightSide, 1.0f},                                // far right: capped at 1
        {"LE=600,RI=1000", -1.0f},                         // no FA: nothing changes
        {"", -1.0f},
        {"FA=0,LE=600,RI=1000", 0.0f},
        {"FA=1,LE=0,RI=0,TO=400,BO=400", 0.3f},             // straight down: k = 0.6
        {"FA=1,LE=200,RI=200,TO=-300,BO=-300", 0.440833f},  // 33 degrees: k = 1
        {"FA=1,LE=100,RI=100,TO=-400,BO=-400", 0.411422f},  // 14 degrees: k = 0.79354
        {"FA=1,LE=2147483647,RI=2147483647", 1.0f},         // no overflow on the way
        {"FA=7,LE=90,RI=90", 0.035f},                       // d = 0.045: -0.1 + 0.135
    };
    DistortionCorrection effect;
    effect.setOption("parameter", "FA=1,LE=400,RI=400");
    float previous = effect.getTargetLevel();
    for (const auto& r : rows) {
        SCOPED_TRACE(r.text);
        LogCapture quiet;
        EXPECT_EQ(1, effect.setOption("parameter", r.text));
        EXPECT_NEAR(r.level < 0 ? previous : r.level, effect.getTargetLevel(), 1e-5);
        previous = effect.getTargetLevel();
    }
    EXPECT_EQ(0, effect.setOption("distortion", "FA=0"));
    EXPECT_EQ(1, KivImaging_getOptionsCount(&effect));
    EXPECT_EQ(0.0f, effect.getCurrentLevel());  // options never move the drawn level
}

TEST_F(GlContextTest, DistortionEasesInAndOut) {
    lookref::Picture picture(12, 10, lookref::makeTestPicture(12, 10, true));
    DistortionCorrection effect;
    EffectRenderer renderer(picture);
    LogCapture quiet;
    for (const char* text : {kRightSide, "FA=0"}) {
        effect.setOption("parameter", text);
        const bool in = text == kRightSide;
        for (int frame = 1; frame <= 14; ++frame) {
            ASSERT_EQ(0, renderer.draw(&effect));
            // The 13th step, 0.975 (or 0.025), is within a step and goes all the way.
            float moved = frame < 13 ? 0.075f * frame : 1.0f;
            EXPECT_NEAR(in ? moved : 1.0f - moved, effect.getCurrentLevel(), 1e-5) << frame;
        }
    }
    float u[4];
    ASSERT_EQ(1, effect.getUniform("u_distortion", u));
    EXPECT_EQ(0.0f, u[0]);
}

// The same frame through the four camera geometries: each is the normal one
// mirrored accordingly (Beauty's face and DistortionCorrection's zoom included).
class CameraOrientation : public GlContextTest, public ::testing::WithParamInterface<int> {};

TEST_P(CameraOrientation, MirrorsTheNormalFrame) {
    const int w = 64, h = 48;
    lookref::Picture picture(w, h, lookref::makeFacePicture(w, h));
    std::unique_ptr<KivFilter> effect(KivImaging_create(GetParam(), nullptr));
    effect->setOption("parameter", GetParam() == 447
                                       ? kRightSide
                                       : "face=1,intensity=3,width=64,height=48,left=14,top=8,"
                                         "right=44,bottom=40,tonemin=7360576,tonemax=16771288");
    LogCapture quiet;
    std::vector<uint8_t> frames[4];
    for (int type = 0; type < 4; ++type) {
        EffectRenderer renderer(picture);
        renderer.program().setCameraGeometryType(static_cast<EglProgram::GeometryType>(type), 0);
        // DistortionCorrection reaches level 1 on the 13th frame and stays.
        for (int frame = 0; frame < (type == 0 ? 13 : 1); ++frame)
            ASSERT_EQ(0, renderer.draw(effect.get()));
        frames[type] = renderer.pixels();
    }
    // Where pixel (x, y) of the normal frame lands in each orientation.
    auto at = [&](int type, int x, int y) {
        bool flipX = type == 2 || type == 3, flipY = type == 0 || type == 2;
        return size_t((flipY ? h - 1 - y : y) * w + (flipX ? w - 1 - x : x)) * 4;
    };
    int worst = 0;
    for (int type : {0, 2, 3})
        for (int y = 0; y < h; ++y)
            for (int x = 0; x < w; ++x)
                for (int k = 0; k < 4; ++k)
                    worst = std::max(worst, std::abs(frames[1][at(1, x, y) + k] -
                                                     frames[type][at(type, x, y) + k]));
    EXPECT_LE(worst, 1);
    EXPECT_NE(frames[1], picture.rgba());
}

INSTANTIATE_TEST_SUITE_P(BeautyAndDistortion, CameraOrientation, ::testing::Values(446, 447));

}  // namespace
