// The built-in sample picture: every patch is where its layout says, with the
// colours it promises.
#include <gtest/gtest.h>

#include <vector>

#include "sample_image.h"

namespace {

using namespace kivcli;
using Rgb = std::vector<int>;

Rgb pixel(const VCImage* image, int x, int y) {
    const uint8_t* p = image->data + (static_cast<size_t>(y) * image->width + x) * 4;
    return {p[0], p[1], p[2]};
}
int centreX(const Rect& r) {
    return r.x + r.width / 2;
}
int centreY(const Rect& r) {
    return r.y + r.height / 2;
}

TEST(Sample, LayoutTilesThePicture) {
    for (auto size : {std::pair<int, int>{960, 640}, {64, 64}, {333, 101}}) {
        const int w = size.first, h = size.second;
        SampleLayout l = sampleLayout(w, h);
        const Rect all[] = {l.bars,      l.greyRamp, l.hueRamp, l.stripes,   l.checker,
                            l.skinLight, l.skinDark, l.redRamp, l.greenRamp, l.blueRamp};
        // Non-empty patches inside the picture whose areas add up to it.
        long long area = 0;
        for (const Rect& r : all) {
            EXPECT_TRUE(r.width > 0 && r.height > 0 && r.x >= 0 && r.y >= 0 && r.x + r.width <= w &&
                        r.y + r.height <= h)
                << w << "x" << h << " patch at " << r.x << "," << r.y;
            area += static_cast<long long>(r.width) * r.height;
        }
        EXPECT_EQ(static_cast<long long>(w) * h, area) << w << "x" << h;
        // Bands: bars on top third, skin tones at the bottom.
        EXPECT_EQ(0, l.bars.y);
        EXPECT_EQ(h / 3, l.bars.height);
        EXPECT_EQ(h, l.skinLight.y + l.skinLight.height);
        EXPECT_EQ(w / 2, l.stripes.x);
    }
}

TEST(Sample, PatchesHoldTheirColours) {
    const int w = 320, h = 240;
    VCImage* image = sampleCreate(w, h);
    ASSERT_NE(nullptr, image);
    ASSERT_EQ(VC_FORMAT_RGBA, image->format);
    ASSERT_EQ(w, image->width);
    ASSERT_EQ(h, image->height);
    SampleLayout l = sampleLayout(w, h);

    // Eight bars of 40 pixels: white, yellow, cyan, green, magenta, red, blue, black.
    const Rgb bars[8] = {{255, 255, 255}, {255, 255, 0}, {0, 255, 255}, {0, 255, 0},
                         {255, 0, 255},   {255, 0, 0},   {0, 0, 255},   {0, 0, 0}};
    for (int i = 0; i < 8; i++) {
        EXPECT_EQ(bars[i], pixel(image, i * 40, 0)) << i;
        EXPECT_EQ(bars[i], pixel(image, i * 40 + 39, 79)) << i;
    }
    // Grey ramp: black at the left edge, white at the right edge, grey in between.
    const int gy = centreY(l.greyRamp);
    EXPECT_EQ((Rgb{0, 0, 0}), pixel(image, l.greyRamp.x, gy));
    EXPECT_EQ((Rgb{255, 255, 255}), pixel(image, l.greyRamp.x + l.greyRamp.width - 1, gy));
    Rgb mid = pixel(image, centreX(l.greyRamp), gy);
    EXPECT_NEAR(128, mid[0], 2);
    EXPECT_EQ((Rgb{mid[0], mid[0], mid[0]}), mid);
    // Hue ramp starts at pure red; a third of the way along it is green.
    EXPECT_EQ((Rgb{255, 0, 0}), pixel(image, l.hueRamp.x, centreY(l.hueRamp)));
    Rgb third = pixel(image, l.hueRamp.x + l.hueRamp.width / 3, centreY(l.hueRamp));
    EXPECT_EQ(255, third[1]);
    EXPECT_LE(third[0], 10);
    EXPECT_EQ(0, third[2]);
    // Stripes alternate per column, the checkerboard per column and row.
    const Rgb white{255, 255, 255}, black{0, 0, 0};
    int sy = centreY(l.stripes);
    EXPECT_EQ(white, pixel(image, l.stripes.x, sy));
    EXPECT_EQ(black, pixel(image, l.stripes.x + 1, sy));
    EXPECT_EQ(black, pixel(image, l.stripes.x + 1, sy + 1));
    int cx = l.checker.x, cy = l.checker.y;
    EXPECT_EQ(white, pixel(image, cx, cy));
    EXPECT_EQ(black, pixel(image, cx + 1, cy));
    EXPECT_EQ(black, pixel(image, cx, cy + 1));
    EXPECT_EQ(white, pixel(image, cx + 1, cy + 1));
    // Skin tones, and the three primary ramps from black to full strength.
    EXPECT_EQ((Rgb{232, 190, 160}), pixel(image, centreX(l.skinLight), centreY(l.skinLight)));
    EXPECT_EQ((Rgb{141, 85, 54}), pixel(image, centreX(l.skinDark), centreY(l.skinDark)));
    int right = l.redRamp.x + l.redRamp.width - 1;
    EXPECT_EQ((Rgb{255, 0, 0}), pixel(image, right, centreY(l.redRamp)));
    EXPECT_EQ((Rgb{0, 255, 0}), pixel(image, right, centreY(l.greenRamp)));
    EXPECT_EQ((Rgb{0, 0, 255}), pixel(image, right, centreY(l.blueRamp)));
    EXPECT_EQ(black, pixel(image, l.redRamp.x, centreY(l.redRamp)));
    // Opaque everywhere.
    for (int i = 0; i < w * h; i++) ASSERT_EQ(255, image->data[i * 4 + 3]) << "pixel " << i;
    VCImage_destroy(image);

    // 64x64 is the smallest picture made.
    EXPECT_EQ(nullptr, sampleCreate(63, 100));
    EXPECT_EQ(nullptr, sampleCreate(100, 0));
    EXPECT_EQ(nullptr, sampleCreate(-5, -5));
    image = sampleCreate(64, 64);
    EXPECT_NE(nullptr, image);
    VCImage_destroy(image);
}

}  // namespace
