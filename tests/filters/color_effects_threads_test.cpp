// kiv-test-labels: threads
// Parameter texts arrive on a client thread while the render thread draws:
// every frame is drawn with all of one text's values, never a mix of two.
#include <gtest/gtest.h>

#include <atomic>
#include <thread>
#include <vector>

#include "core/filters/sce/colorEffects.h"
#include "support/effect_renderer.h"
#include "support/gl_context.h"
#include "support/log_capture.h"
#include "support/look_reference.h"

TEST_F(GlContextTest, FramesSeeOneWholeParameterTextWhileAnotherThreadSetsThem) {
    const int w = 16, h = 8;
    lookref::Picture picture(w, h, lookref::makeTestPicture(w, h, true));
    // Every value differs between the two, so a frame mixing them is neither.
    const char* texts[2] = {"TE=200,TI=150,CO=100,SA=-200,HL=150,SL=100",
                            "TE=-200,TI=-150,CO=-150,SA=200,HL=-150,SL=-100"};
    CustomColor effect;
    EffectRenderer renderer(picture);
    ASSERT_TRUE(renderer.ok());
    std::vector<uint8_t> looks[2];
    for (int i = 0; i < 2; ++i) {
        effect.setOption("parameter", texts[i]);
        ASSERT_EQ(0, renderer.draw(&effect));
        looks[i] = renderer.pixels();
    }
    ASSERT_NE(looks[0], looks[1]);

    LogCapture quiet;
    std::atomic<bool> stop{false};
    std::thread client([&] {
        for (int i = 0; !stop; ++i) effect.setOption("parameter", texts[i % 2]);
    });
    int unknown = 0;
    for (int frame = 0; frame < 150; ++frame) {
        ASSERT_EQ(0, renderer.draw(&effect));
        std::vector<uint8_t> got = renderer.pixels();
        unknown += got != looks[0] && got != looks[1];
    }
    stop = true;
    client.join();
    EXPECT_EQ(0, unknown);
}
