// The geometric effects: their pictures through the buffered processor at odd
// and even sizes against the CPU statement of their sampling (Ripple and
// DistortionCorrection at several frames), and DistortionCorrection's option,
// animation and per-frame uniforms. Load failures and GL objects: effect_gl_test.
#include <gtest/gtest.h>

#include <cmath>
#include <memory>
#include <string>
#include <vector>

#include "core/KivImaging.h"
#include "core/KivPixelReach.h"
#include "core/VFilterBufferedProcessorImpl.h"
#include "core/egl/EglProgram.h"
#include "core/filters/sce/geometricEffects.h"
#include "support/effect_renderer.h"
#include "support/gl_context.h"
#include "support/log_capture.h"
#include "support/look_reference.h"
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
    auto* processor = static_cast<VFilterBufferedProcessorImpl*>(BufferedProcessor_Create());
    processor->initialize();
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
    processor->release();
    BufferedProcessor_Destroy(processor);
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

TEST_F(GlContextTest, DistortionEasesInAndOutAndFollowsThePreviewShape) {
    lookref::Picture picture(12, 10, lookref::makeTestPicture(12, 10, true));
    DistortionCorrection effect;
    EffectRenderer renderer(picture);
    ASSERT_TRUE(renderer.ok());
    LogCapture quiet;
    effect.setOption("parameter", kRightSide);
    for (int frame = 1; frame <= 14; ++frame) {
        ASSERT_EQ(0, renderer.draw(&effect));
        // The 13th step, 0.975, is within a step of 1 and goes all the way.
        EXPECT_NEAR(frame < 13 ? 0.075f * frame : 1.0f, effect.getCurrentLevel(), 1e-5) << frame;
    }
    // The four coordinate sets, zoomed 7.5% per side at level 1.
    const float lo = 0.075f, hi = 0.925f;
    // clang-format off
    const float sets[4][8] = {{lo, hi, hi, hi, lo, lo, hi, lo}, {lo, lo, hi, lo, lo, hi, hi, hi},
                              {hi, hi, lo, hi, hi, lo, lo, lo}, {hi, lo, lo, lo, hi, hi, lo, hi}};
    // clang-format on
    const float* actual[4] = {DistortionCorrection::DISTORTION_TEXCOORD,
                              DistortionCorrection::DISTORTION_TEXCOORD_V_FLIP,
                              DistortionCorrection::DISTORTION_TEXCOORD_H_FLIP,
                              DistortionCorrection::DISTORTION_TEXCOORD_HV_FLIP};
    for (int k = 0; k < 4; ++k)
        for (int v = 0; v < 8; ++v) EXPECT_NEAR(sets[k][v], actual[k][v], 1e-6) << k << "," << v;
    // u_distortion is the level for frames at least 1.7 wide, stronger below.
    float u[4];
    for (auto shape : {std::make_pair(1920, 1080), std::make_pair(1440, 1080)}) {
        renderer.program().setPreviewGeometry(shape.first, shape.second, false);
        ASSERT_EQ(0, renderer.draw(&effect));
        ASSERT_EQ(1, effect.getUniform("u_distortion", u));
        EXPECT_FLOAT_EQ(shape.first == 1920 ? 1.0f : 1.2238373f, u[0]);
        ASSERT_EQ(1, effect.getUniform("u_ratio", u));
        EXPECT_FLOAT_EQ(float(shape.first) / shape.second, u[0]);
    }
    // Switched off: back to nothing in 13 frames.
    effect.setOption("parameter", "FA=0");
    for (int frame = 1; frame <= 13; ++frame) ASSERT_EQ(0, renderer.draw(&effect));
    EXPECT_EQ(0.0f, effect.getCurrentLevel());
    ASSERT_EQ(1, effect.getUniform("u_distortion", u));
    EXPECT_EQ(0.0f, u[0]);
}

TEST(GeometricEffects, IdentityAndReach) {
    struct Row {
        int id;
        bool singlePass;      // draws through the program's own quad
        KivPixelReach reach;  // at 640x480
    } rows[] = {
        {445, true, {KivPixelReach::NEIGHBOURS, 25}},  // 32 px cells: 24 rows, +1 filtering
        {444, true, {KivPixelReach::NEIGHBOURS, 21}},  // 0.04 of 480 rows, +1
        {441, true, {KivPixelReach::NEIGHBOURS, 2}},
        {417, true, {KivPixelReach::WHOLE_PICTURE, 0}},
        {447, false, {KivPixelReach::WHOLE_PICTURE, 0}},
        {446, false, {KivPixelReach::WHOLE_PICTURE, 0}},
    };
    for (const Row& r : rows) {
        SCOPED_TRACE(r.id);
        std::unique_ptr<KivFilter> f(KivImaging_create(r.id, nullptr));
        ASSERT_NE(nullptr, f);
        EXPECT_EQ(r.id, f->getFilterType());
        EXPECT_EQ(r.singlePass, dynamic_cast<SingleCameraEffects*>(f.get()) != nullptr);
        KivPixelReach reach = KivFilter_pixelReach(f.get(), 640, 480);
        EXPECT_EQ(r.reach.kind, reach.kind);
        EXPECT_EQ(r.reach.haloRows, reach.haloRows);
        EXPECT_EQ(VC_ERROR_UNSUPPORTED, f->doEffect());
    }
}

}  // namespace
