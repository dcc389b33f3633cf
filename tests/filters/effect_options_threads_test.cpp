// kiv-test-labels: threads
// Parameter texts arrive on a client thread while the render thread draws:
// every frame is drawn with all of one text's values, never a mix of two.
#include <gtest/gtest.h>

#include <atomic>
#include <cmath>
#include <thread>
#include <vector>

#include "core/filters/sce/beauty.h"
#include "core/filters/sce/colorEffects.h"
#include "core/filters/sce/geometricEffects.h"
#include "support/effect_renderer.h"
#include "support/gl_context.h"
#include "support/log_capture.h"
#include "support/look_reference.h"

namespace {

// Runs `setter` on another thread until `frames` frames were drawn and
// checked by `check`; a text is set at least once before the first frame.
template <class Check>
void drawWhileSetting(EffectRenderer& renderer, KivFilter& effect, const char* const texts[2],
                      int frames, Check check) {
    LogCapture quiet;
    std::atomic<bool> stop{false};
    std::atomic<int> set{0};
    std::thread client([&] {
        for (int i = 0; !stop; ++i) {
            effect.setOption("parameter", texts[i % 2]);
            ++set;
        }
    });
    while (set == 0) std::this_thread::yield();
    for (int frame = 0; frame < frames; ++frame) {
        ASSERT_EQ(0, renderer.draw(&effect));
        check(frame);
    }
    stop = true;
    client.join();
}

}  // namespace

TEST_F(GlContextTest, FramesSeeOneWholeTextWhileAnotherThreadSetsThem) {
    const int w = 32, h = 24;
    lookref::Picture picture(w, h, lookref::makeFacePicture(w, h));
    // Every value differs between the two texts of each effect, so a frame
    // drawn from a mix of them is neither look.
    const char* const colours[2] = {"TE=200,TI=150,CO=100,SA=-200,HL=150,SL=100",
                                    "TE=-200,TI=-150,CO=-150,SA=200,HL=-150,SL=-100"};
    const char* const faces[2] = {
        "face=1,intensity=4,width=32,height=24,left=4,top=2,right=24,bottom=22,tonemin=3158064,"
        "tonemax=16777200",
        "face=1,intensity=2,width=32,height=24,left=10,top=6,right=28,bottom=20,tonemin=3158064,"
        "tonemax=16777200"};
    CustomColor custom;
    Beauty beauty;
    for (KivFilter* effect : {static_cast<KivFilter*>(&custom), static_cast<KivFilter*>(&beauty)}) {
        const char* const* texts = effect == &custom ? colours : faces;
        EffectRenderer renderer(picture);
        ASSERT_TRUE(renderer.ok());
        std::vector<uint8_t> looks[2];
        for (int i = 0; i < 2; ++i) {
            effect->setOption("parameter", texts[i]);
            ASSERT_EQ(0, renderer.draw(effect));
            looks[i] = renderer.pixels();
        }
        ASSERT_NE(looks[0], looks[1]);
        int mixed = 0;
        drawWhileSetting(renderer, *effect, texts, 60, [&](int) {
            std::vector<uint8_t> got = renderer.pixels();
            mixed += got != looks[0] && got != looks[1];
        });
        EXPECT_EQ(0, mixed) << effect->getFilterType();
    }
}

TEST_F(GlContextTest, DistortionEasesAtMostAStepPerFrameWhileTargetsChange) {
    lookref::Picture picture(16, 12, lookref::makeTestPicture(16, 12, true));
    DistortionCorrection effect;
    EffectRenderer renderer(picture);
    ASSERT_TRUE(renderer.ok());
    const char* const texts[2] = {"FA=1,LE=600,RI=1000", "FA=0"};
    float previous = 0.0f;
    drawWhileSetting(renderer, effect, texts, 60, [&](int) {
        float level = effect.getCurrentLevel();
        // A step of 0.075, and the last one taken whole when it lands within
        // 0.075 of the target: never more than 0.15 a frame.
        EXPECT_LE(std::fabs(level - previous), 0.15f + 1e-6f);
        EXPECT_TRUE(level >= 0.0f && level <= 1.0f) << level;
        previous = level;
    });
}
