// The built-in sample picture: every patch is where its layout says, with the
// colours it promises.
#include <gtest/gtest.h>

#include "sample_image.h"

namespace {

using namespace kivcli;

struct Rgb {
    int r, g, b;
};

Rgb pixel(const VCImage* image, int x, int y) {
    const uint8_t* p = image->data + (static_cast<size_t>(y) * image->width + x) * 4;
    return {p[0], p[1], p[2]};
}

void expectRgb(const VCImage* image, int x, int y, int r, int g, int b) {
    Rgb p = pixel(image, x, y);
    EXPECT_EQ(r, p.r) << "at " << x << "," << y;
    EXPECT_EQ(g, p.g) << "at " << x << "," << y;
    EXPECT_EQ(b, p.b) << "at " << x << "," << y;
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
        // Each pixel belongs to exactly one patch.
        long long area = 0;
        for (const Rect& r : all) {
            EXPECT_GT(r.width, 0);
            EXPECT_GT(r.height, 0);
            EXPECT_GE(r.x, 0);
            EXPECT_GE(r.y, 0);
            EXPECT_LE(r.x + r.width, w);
            EXPECT_LE(r.y + r.height, h);
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
    const int bars[8][3] = {{255, 255, 255}, {255, 255, 0}, {0, 255, 255}, {0, 255, 0},
                            {255, 0, 255},   {255, 0, 0},   {0, 0, 255},   {0, 0, 0}};
    for (int i = 0; i < 8; i++) {
        expectRgb(image, i * 40 + 20, 40, bars[i][0], bars[i][1], bars[i][2]);
        expectRgb(image, i * 40, 0, bars[i][0], bars[i][1], bars[i][2]);
        expectRgb(image, i * 40 + 39, 79, bars[i][0], bars[i][1], bars[i][2]);
    }
    // Grey ramp: black at the left edge, white at the right edge, grey in between.
    expectRgb(image, l.greyRamp.x, centreY(l.greyRamp), 0, 0, 0);
    expectRgb(image, l.greyRamp.x + l.greyRamp.width - 1, centreY(l.greyRamp), 255, 255, 255);
    Rgb mid = pixel(image, centreX(l.greyRamp), centreY(l.greyRamp));
    EXPECT_NEAR(128, mid.r, 2);
    EXPECT_EQ(mid.r, mid.g);
    EXPECT_EQ(mid.r, mid.b);
    // Hue ramp starts at pure red; a third of the way along it is green.
    expectRgb(image, l.hueRamp.x, centreY(l.hueRamp), 255, 0, 0);
    Rgb third = pixel(image, l.hueRamp.x + l.hueRamp.width / 3, centreY(l.hueRamp));
    EXPECT_EQ(255, third.g);
    EXPECT_LE(third.r, 10);
    EXPECT_EQ(0, third.b);
    // Stripes alternate per column, the checkerboard per column and row.
    int sy = centreY(l.stripes);
    expectRgb(image, l.stripes.x, sy, 255, 255, 255);
    expectRgb(image, l.stripes.x + 1, sy, 0, 0, 0);
    expectRgb(image, l.stripes.x + 1, sy + 1, 0, 0, 0);
    int cx = l.checker.x, cy = l.checker.y;
    expectRgb(image, cx, cy, 255, 255, 255);
    expectRgb(image, cx + 1, cy, 0, 0, 0);
    expectRgb(image, cx, cy + 1, 0, 0, 0);
    expectRgb(image, cx + 1, cy + 1, 255, 255, 255);
    // Skin tones, and the three primary ramps ending at full strength.
    expectRgb(image, centreX(l.skinLight), centreY(l.skinLight), 232, 190, 160);
    expectRgb(image, centreX(l.skinDark), centreY(l.skinDark), 141, 85, 54);
    int right = l.redRamp.x + l.redRamp.width - 1;
    expectRgb(image, right, centreY(l.redRamp), 255, 0, 0);
    expectRgb(image, right, centreY(l.greenRamp), 0, 255, 0);
    expectRgb(image, right, centreY(l.blueRamp), 0, 0, 255);
    expectRgb(image, l.redRamp.x, centreY(l.redRamp), 0, 0, 0);
    // Opaque everywhere.
    for (int i = 0; i < w * h; i++) ASSERT_EQ(255, image->data[i * 4 + 3]) << "pixel " << i;
    VCImage_destroy(image);
}

TEST(Sample, RefusesTinySizes) {
    EXPECT_EQ(nullptr, sampleCreate(63, 100));
    EXPECT_EQ(nullptr, sampleCreate(100, 0));
    EXPECT_EQ(nullptr, sampleCreate(-5, -5));
    VCImage* smallest = sampleCreate(64, 64);
    EXPECT_NE(nullptr, smallest);
    VCImage_destroy(smallest);
}

}  // namespace
