// The fixed single-pass looks: what the factory builds for their ids, the band
// edges of the quantising looks, and the base and broken snippets drawn through
// EglProgram on llvmpipe. Every look's whole picture is compared with its CPU
// statement through the buffered processor (tests/processor).
#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <vector>

#include "core/KivImaging.h"
#include "core/egl/EglProgram.h"
#include "core/egl/EglRecycler.h"
#include "core/filters/sce/fixedLooks.h"
#include "core/filters/sce/singleCameraEffects.h"
#include "support/effect_renderer.h"
#include "support/gl_context.h"
#include "support/log_capture.h"
#include "support/look_reference.h"

namespace {

// A member with the base snippet (code == nullptr) or one of its own.
class SnippetEffect : public SingleCameraEffects {
public:
    explicit SnippetEffect(const char* code = nullptr) : mCode(code) {}
    int getFilterType() const override { return 390; }
    const char* getFragmentShader() const override {
        return mCode ? mCode : SingleCameraEffects::getFragmentShader();
    }

private:
    const char* mCode;
};

struct Rendered {
    std::vector<uint8_t> pixels;
    int drawResult = -100;
};

Rendered renderWithProgram(KivFilter* effect, const lookref::Picture& picture) {
    Rendered out;
    out.pixels = EffectRenderer_renderOnce(effect, picture, &out.drawResult);
    return out;
}

}  // namespace

TEST(SingleCameraEffects, FactoryBuildsEachLookWithItsOwnSnippet) {
    for (int id : lookref::lookIds()) {
        KivFilter* f = KivImaging_create(id, nullptr);
        auto* sce = dynamic_cast<SingleCameraEffects*>(f);
        ASSERT_NE(nullptr, sce) << id;
        EXPECT_EQ(id, f->getFilterType());
        EXPECT_EQ(0, KivImaging_getOptionsCount(f));
        const char* code = sce->getFragmentShader();
        ASSERT_NE(nullptr, code);
        EXPECT_NE(nullptr, strstr(code, "vec4 doEffect()")) << id;
        // Only the pass-through look uses the base snippet.
        EXPECT_EQ(id == 400, std::string(code) == SingleCameraEffects::kPassThroughShader) << id;
        KivImaging_destroy(f);
    }
    SnippetEffect base;
    EXPECT_STREQ("vec4 doEffect() { return texture2D(texSampler, v_texcoord); }",
                 base.getFragmentShader());
    // No CPU path, both GL paths, nothing of its own to release.
    Sepia sepia;
    android::sp<EglRecycler> recycler = new EglRecycler();
    EXPECT_EQ(0, sepia.releaseGL(*recycler));
    EXPECT_EQ(VC_ERROR_UNSUPPORTED, sepia.doEffect());
    EXPECT_TRUE(sepia.isGLPreviewSupported() && sepia.isGLPictureSupported());
}

TEST_F(GlContextTest, EdgeValuesOfTheQuantisingLooks) {
    // White, black, and greys around the band limits.
    lookref::Picture picture(6, 1, {255, 255, 255, 255, 0,   0,   0,   255, 76,  77,  76,  255,
                                    77,  77,  77,  255, 204, 204, 205, 255, 127, 127, 128, 255});
    auto rgb = [](const Rendered& r, int i) {
        return std::vector<int>(r.pixels.begin() + i * 4, r.pixels.begin() + i * 4 + 3);
    };
    using Rgb = std::vector<int>;
    Posterize posterize;
    Rendered r = renderWithProgram(&posterize, picture);
    ASSERT_EQ(24u, r.pixels.size());
    // floor(1.0 * 4) / 3 = 4/3, clamped by the target.
    EXPECT_EQ((Rgb{255, 255, 255}), rgb(r, 0));
    EXPECT_EQ((Rgb{0, 0, 0}), rgb(r, 1));
    BW bw;
    r = renderWithProgram(&bw, picture);
    ASSERT_EQ(24u, r.pixels.size());
    const int grey[6] = {0, 0, 0, 255, 0, 255};  // 229/765 < 0.3 <= 231/765
    for (int i = 0; i < 6; ++i) {
        EXPECT_EQ(grey[i], r.pixels[i * 4]) << i;
        EXPECT_EQ(255, r.pixels[i * 4 + 3]) << i;
    }
    ThermalVision thermal;
    r = renderWithProgram(&thermal, picture);
    ASSERT_EQ(24u, r.pixels.size());
    // White is the red end, black the blue end; mean 382/765, just below the
    // middle, is nearly pure yellow from the blue side.
    EXPECT_EQ((Rgb{255, 0, 0}), rgb(r, 0));
    EXPECT_EQ(0, r.pixels[4]);
    EXPECT_EQ(255, r.pixels[6]);
    EXPECT_NEAR(254, r.pixels[20], 1);
    EXPECT_NEAR(254, r.pixels[21], 1);
    EXPECT_NEAR(1, r.pixels[22], 1);
}

TEST_F(GlContextTest, BaseSnippetDrawsAndBrokenSnippetsFallBack) {
    const int w = 16, h = 8;
    lookref::Picture picture(w, h, lookref::makeTestPicture(w, h, false));
    SnippetEffect base;
    Rendered r = renderWithProgram(&base, picture);
    EXPECT_EQ(0, r.drawResult);
    // The snippet keeps alpha; the program's default shader would force 1.
    EXPECT_EQ(picture.rgba(), r.pixels);
    EXPECT_EQ(0, base.onDrawFrame(*android::sp<EglProgram>(new EglProgram())));

    std::vector<uint8_t> opaque = picture.rgba();
    for (size_t i = 3; i < opaque.size(); i += 4) opaque[i] = 255;
    {
        SnippetEffect effect("vec4 doEffect() { return undefined_thing; }");
        LogCapture log;
        r = renderWithProgram(&effect, picture);
        EXPECT_TRUE(log.contains(4, "SingleEffect: could not load this shader"));
        EXPECT_EQ(1u,
                  log.countPrefix("VC_ERROR_UNKNOWN (-1): core/filters/sce/singleCameraEffects:"));
        EXPECT_TRUE(log.contains("GL Error: failed to load effect shader. Loading default."));
        EXPECT_EQ(opaque, r.pixels);
    }
    {
        // Compiles alone, but reads a varying the vertex shader never writes.
        SnippetEffect effect(
            "varying highp vec2 v_missing; vec4 doEffect() { return vec4(v_missing, 0.0, 1.0); }");
        LogCapture log;
        r = renderWithProgram(&effect, picture);
        EXPECT_FALSE(log.contains("SingleEffect: could not load this shader"));
        EXPECT_EQ(1u, log.countPrefix("SingleEffect: failed to link this shader: "));
        EXPECT_EQ(opaque, r.pixels);
    }
}
