// The fixed single-pass looks: the band edges of the quantising looks (the
// whole-picture comparison in tests/processor skips pixels near a threshold)
// and the base snippet, drawn through EglProgram on llvmpipe. Broken snippets:
// effect_gl_test.
#include <gtest/gtest.h>

#include <map>
#include <vector>

#include "core/egl/EglProgram.h"
#include "core/filters/sce/fixedLooks.h"
#include "core/filters/sce/singleCameraEffects.h"
#include "support/effect_renderer.h"
#include "support/gl_context.h"
#include "support/look_reference.h"

namespace {

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
