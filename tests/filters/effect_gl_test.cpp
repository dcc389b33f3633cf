// Effects drawn through EglProgram on llvmpipe: load failures logged under
// each effect's own source with the pass-through taking over (opaque); no GL
// object left over a thousand switches on one long-lived program, as a live
// pipeline keeps it; the quantising looks' band edges and the base snippet.
#include <gtest/gtest.h>

#include <map>
#include <memory>
#include <string>
#include <vector>

#include "core/KivImaging.h"
#include "core/egl/EglProgram.h"
#include "core/filters/sce/beauty.h"
#include "core/filters/sce/colorEffects.h"
#include "core/filters/sce/fixedLooks.h"
#include "core/filters/sce/geometricEffects.h"
#include "core/filters/sce/singleCameraEffects.h"
#include "support/effect_renderer.h"
#include "support/gl_context.h"
#include "support/gl_fault.h"
#include "support/log_capture.h"
#include "support/look_reference.h"
#include "vccore/vc_log.h"

namespace {

// A copy of an effect with a shader that cannot compile.
template <class Effect>
class Uncompilable : public Effect {
public:
    const char* getFragmentShader() const override { return "void main() { broken"; }
};

// A single-pass look with a snippet of its own.
class Snippet : public SingleCameraEffects {
public:
    explicit Snippet(const char* code) : mCode(code) {}
    int getFilterType() const override { return 390; }
    const char* getFragmentShader() const override { return mCode; }

private:
    const char* mCode;
};

// Whether an effect holds GL objects of its own now.
bool holdsGl(KivFilter* f) {
    if (auto* full = dynamic_cast<FullShaderEffects*>(f)) return full->hasShader();
    if (auto* beauty = dynamic_cast<Beauty*>(f))
        return beauty->hasPrograms() || beauty->hasBlurTargets();
    return false;
}

TEST_F(GlContextTest, LoadFailuresAreLoggedUnderTheEffectsOwnSourceAndFallBack) {
    const int w = 8, h = 6;
    lookref::Picture picture(w, h, lookref::makeTestPicture(w, h, false));
    std::vector<uint8_t> opaque = picture.rgba();
    for (size_t i = 3; i < opaque.size(); i += 4) opaque[i] = 255;
    Uncompilable<CustomColor> custom;
    Uncompilable<Serene> serene;
    Uncompilable<DistortionCorrection> distortion;
    Brightness brightness;
    Beauty beauty;
    Snippet undefined("vec4 doEffect() { return undefined_thing; }");
    // Compiles alone, but reads a varying the vertex shader never writes.
    Snippet unlinked(
        "varying highp vec2 v_missing; vec4 doEffect() { return vec4(v_missing, 0.0, 1.0); }");
    const std::string compile = "E Failed to compile shader: *",
                      noProgram = "E Could not create a new program";
    struct Row {
        KivFilter* effect;
        int programFaults;               // program creations that fail
        std::vector<std::string> lines;  // every warning and error, before the fall-back's
    } rows[] = {
        {&custom, 0, {compile, "E VC_ERROR_UNKNOWN (-1): core/filters/sce/customColor:#"}},
        {&serene, 0, {compile, "E VC_ERROR_UNKNOWN (-1): core/filters/sce/colorPresets:#"}},
        {&distortion,
         0,
         {compile, "E VC_ERROR_UNKNOWN (-1): core/filters/sce/distortionCorrection:#"}},
        {&brightness,
         1,
         {noProgram, "E VC_ERROR_UNKNOWN (-1): core/egl/EglShader:#",
          "E VC_ERROR_ALLOC_FAILED (-5): core/filters/sce/brightness:#"}},
        {&beauty,
         1,
         {noProgram, "E VC_ERROR_UNKNOWN (-1): core/egl/EglShader:#",
          "E VC_ERROR_ALLOC_FAILED (-5): core/filters/sce/beauty:#"}},
        {&undefined,
         0,
         {compile, "E SingleEffect: could not load this shader",
          "E VC_ERROR_UNKNOWN (-1): core/filters/sce/singleCameraEffects:#"}},
        {&unlinked,
         0,
         {"E GL Error: Program failed to link.", "E VC_ERROR_UNKNOWN (-1): core/egl/EglShader:#",
          "E SingleEffect: failed to link this shader: -1"}},
    };
    for (Row& r : rows) {
        SCOPED_TRACE(r.lines.back());
        EffectRenderer renderer(picture);
        ASSERT_TRUE(renderer.ok());
        LogCapture log;
        GlFault_failProgramCreations(r.programFaults);
        int result = renderer.draw(r.effect);
        GlFault_failProgramCreations(0);
        EXPECT_EQ(0, result);
        r.lines.push_back("E GL Error: failed to load effect shader. Loading default.");
        EXPECT_TRUE(log.matches(r.lines));
        EXPECT_FALSE(holdsGl(r.effect));
        // The pass-through took over: the picture, opaque.
        EXPECT_EQ(opaque, renderer.pixels());
    }
    // The same effects load once the driver has programs again.
    EffectRenderer renderer(picture);
    for (KivFilter* f : {static_cast<KivFilter*>(&brightness), static_cast<KivFilter*>(&beauty)}) {
        ASSERT_EQ(0, renderer.draw(f));
        EXPECT_TRUE(holdsGl(f));
    }
}

TEST_F(GlContextTest, AThousandSwitchesOnOneProgramLeaveNoGlObject) {
    const int w = 24, h = 16;
    lookref::Picture picture(w, h, lookref::makeFacePicture(w, h));
    std::vector<std::unique_ptr<KivFilter>> effects;
    for (int id = 425; id <= 436; ++id) effects.emplace_back(KivImaging_create(id, nullptr));
    for (int id : {445, 444, 441, 417, 447}) effects.emplace_back(KivImaging_create(id, nullptr));
    auto beauty = std::make_unique<Beauty>();
    KivFilter* fisheye = effects[15].get();  // no GL objects of its own
    LogCapture quiet;
    int before = 0;
    {
        EffectRenderer renderer(picture);
        ASSERT_TRUE(renderer.ok());
        ASSERT_EQ(0, renderer.draw(fisheye));
        before = GlTest_liveObjects(4096);
        for (int i = 0; i < 1000; ++i) {
            // Beauty builds four programs per switch, slow on a software GL: it
            // comes every 25th switch and then draws three frames at changing
            // preview sizes, which rebuild its blur targets.
            KivFilter* f = i % 25 == 12 ? beauty.get() : effects[i % effects.size()].get();
            int n = (i * 37) % 401 - 200;
            std::string text =
                "intensity=" + std::to_string(n) + ",highlight=" + std::to_string(n / 2) +
                ",shadow=" + std::to_string(-n) + ",TE=" + std::to_string(n) +
                ",SA=" + std::to_string(-n) + ",FA=" + std::to_string(i % 2) +
                ",LE=" + std::to_string(n) +
                ",face=1,width=24,height=16,left=2,top=2,right=" + std::to_string(12 + i % 7) +
                ",bottom=14,tonemin=3158064,tonemax=16777200";
            f->setOption("parameter", text.c_str());
            for (int frame = 0; frame < (f == beauty.get() ? 3 : 1); ++frame) {
                renderer.program().setPreviewGeometry(w - 4 * frame, h + 4 * frame, false);
                ASSERT_EQ(0, renderer.draw(f)) << i;
            }
            renderer.program().setPreviewGeometry(w, h, false);
            // Now and then: the switch really drew this effect, into the target
            // (as a program of its own draws it; the animated two move on every
            // frame). Right after Beauty, recycling its blur targets must not
            // have unbound the frame's target.
            if ((i % 97 == 0 || i % 25 == 13) && f->getFilterType() != 444 &&
                f->getFilterType() != 447) {
                std::vector<uint8_t> drawn = renderer.pixels();
                EXPECT_EQ(EffectRenderer_renderOnce(f, picture), drawn) << i;
            }
        }
        // Back to the effect counted first: what each switch handed to the
        // recycler is gone.
        ASSERT_EQ(0, renderer.draw(fisheye));
        EXPECT_EQ(before, GlTest_liveObjects(4096));
    }
    for (auto& f : effects) EXPECT_FALSE(holdsGl(f.get())) << f->getFilterType();
    EXPECT_FALSE(holdsGl(beauty.get()));
}

// The band edges of the quantising looks: the whole-picture comparison in
// tests/processor skips pixels near a threshold.
TEST_F(GlContextTest, EdgeValuesOfTheQuantisingLooks) {
    // White, black, and greys around the band limits.
    lookref::Picture picture(6, 1, {255, 255, 255, 255, 0,   0,   0,   255, 76,  77,  76,  255,
                                    77,  77,  77,  255, 204, 204, 205, 255, 127, 127, 128, 255});
    Posterize posterize;
    BW bw;
    ThermalVision thermal;
    struct Row {
        KivFilter* look;
        int pixel, channel, value;
    } rows[] = {
        // clang-format off
        // floor(1.0 * 4) / 3 = 4/3, clamped by the target.
        {&posterize, 0, 0, 255}, {&posterize, 0, 2, 255}, {&posterize, 1, 0, 0},
        // 229/765 < 0.3 <= 231/765
        {&bw, 0, 0, 0}, {&bw, 2, 0, 0}, {&bw, 3, 0, 255}, {&bw, 4, 0, 0}, {&bw, 5, 0, 255},
        {&bw, 2, 3, 255},
        // White is the red end, black the blue end; mean 382/765, just below
        // the middle, is nearly pure yellow from the blue side.
        {&thermal, 0, 0, 255}, {&thermal, 0, 1, 0}, {&thermal, 0, 2, 0}, {&thermal, 1, 0, 0},
        {&thermal, 1, 2, 255}, {&thermal, 5, 0, 254}, {&thermal, 5, 1, 254}, {&thermal, 5, 2, 1},
        // clang-format on
    };
    std::map<KivFilter*, std::vector<uint8_t>> drawn;
    for (KivFilter* look : {(KivFilter*)&posterize, (KivFilter*)&bw, (KivFilter*)&thermal}) {
        drawn[look] = EffectRenderer_renderOnce(look, picture);
        ASSERT_EQ(24u, drawn[look].size());
    }
    for (const Row& r : rows) {
        const std::vector<uint8_t>& pixels = drawn[r.look];
        EXPECT_NEAR(r.value, pixels[r.pixel * 4 + r.channel], r.look == &thermal ? 1 : 0)
            << r.look->getFilterType() << " pixel " << r.pixel << " channel " << r.channel;
    }
}

TEST_F(GlContextTest, TheBaseSnippetKeepsAlpha) {
    // A member with the base snippet.
    struct Base : SingleCameraEffects {
        int getFilterType() const override { return 390; }
    } base;
    lookref::Picture picture(16, 8, lookref::makeTestPicture(16, 8, false));
    int result = -100;
    // The program's default shader would force alpha to 1.
    EXPECT_EQ(picture.rgba(), EffectRenderer_renderOnce(&base, picture, &result));
    EXPECT_EQ(0, result);
    EXPECT_EQ(0, base.onDrawFrame(*android::sp<EglProgram>(new EglProgram())));
    EXPECT_EQ(VC_ERROR_UNSUPPORTED, base.doEffect());
    EXPECT_TRUE(base.isGLPreviewSupported() && base.isGLPictureSupported());
}

}  // namespace
