#include "sample_image.h"

#include <math.h>

namespace kivcli {

const uint8_t kSampleBarColours[8][3] = {
    {255, 255, 255}, {255, 255, 0}, {0, 255, 255}, {0, 255, 0},
    {255, 0, 255},   {255, 0, 0},   {0, 0, 255},   {0, 0, 0},
};
const uint8_t kSampleSkinLight[3] = {232, 190, 160};
const uint8_t kSampleSkinDark[3] = {141, 85, 54};

namespace {

void put(VCImage* image, int x, int y, uint8_t r, uint8_t g, uint8_t b) {
    uint8_t* p = image->data + (static_cast<size_t>(y) * image->width + x) * 4;
    p[0] = r;
    p[1] = g;
    p[2] = b;
    p[3] = 255;
}

// 0…255 across a rectangle, left to right.
uint8_t rampAt(const Rect& rect, int x) {
    if (rect.width <= 1) return 0;
    return static_cast<uint8_t>(lround(255.0 * (x - rect.x) / (rect.width - 1)));
}

// Fully saturated hue wheel, red → yellow → green → cyan → blue → magenta.
void hue(double h, uint8_t* r, uint8_t* g, uint8_t* b) {
    double s = h * 6.0;
    int sector = static_cast<int>(s) % 6;
    double f = s - floor(s);
    uint8_t up = static_cast<uint8_t>(lround(255.0 * f));
    uint8_t down = static_cast<uint8_t>(255 - up);
    switch (sector) {
        case 0:
            *r = 255, *g = up, *b = 0;
            break;
        case 1:
            *r = down, *g = 255, *b = 0;
            break;
        case 2:
            *r = 0, *g = 255, *b = up;
            break;
        case 3:
            *r = 0, *g = down, *b = 255;
            break;
        case 4:
            *r = up, *g = 0, *b = 255;
            break;
        default:
            *r = 255, *g = 0, *b = down;
            break;
    }
}

bool inside(const Rect& rect, int x, int y) {
    return x >= rect.x && x < rect.x + rect.width && y >= rect.y && y < rect.y + rect.height;
}

}  // namespace

SampleLayout sampleLayout(int width, int height) {
    SampleLayout l;
    int third = height / 3;
    int band2 = third, band3 = 2 * third;
    int half = width / 2;
    int middleHalf = third / 2;
    l.bars = {0, 0, width, third};
    l.greyRamp = {0, band2, half, middleHalf};
    l.hueRamp = {0, band2 + middleHalf, half, third - middleHalf};
    l.stripes = {half, band2, width - half, middleHalf};
    l.checker = {half, band2 + middleHalf, width - half, third - middleHalf};
    int bottom = height - band3;
    int fifth = width / 5;
    l.skinLight = {0, band3, fifth, bottom};
    l.skinDark = {fifth, band3, fifth, bottom};
    int rampWidth = width - 2 * fifth;
    int rampRow = bottom / 3;
    l.redRamp = {2 * fifth, band3, rampWidth, rampRow};
    l.greenRamp = {2 * fifth, band3 + rampRow, rampWidth, rampRow};
    l.blueRamp = {2 * fifth, band3 + 2 * rampRow, rampWidth, bottom - 2 * rampRow};
    return l;
}

VCImage* sampleCreate(int width, int height) {
    if (width < kSampleMinSize || height < kSampleMinSize) return nullptr;
    VCImage* image = VCImage_createNew(width, height, VC_FORMAT_RGBA);
    if (image == nullptr) return nullptr;
    const SampleLayout l = sampleLayout(width, height);
    for (int y = 0; y < height; y++) {
        for (int x = 0; x < width; x++) {
            uint8_t r = 0, g = 0, b = 0;
            if (inside(l.bars, x, y)) {
                const uint8_t* c = kSampleBarColours[x * 8 / width];
                r = c[0], g = c[1], b = c[2];
            } else if (inside(l.greyRamp, x, y)) {
                r = g = b = rampAt(l.greyRamp, x);
            } else if (inside(l.hueRamp, x, y)) {
                hue(static_cast<double>(x - l.hueRamp.x) / l.hueRamp.width, &r, &g, &b);
            } else if (inside(l.stripes, x, y)) {
                r = g = b = ((x - l.stripes.x) & 1) ? 0 : 255;
            } else if (inside(l.checker, x, y)) {
                r = g = b = ((x - l.checker.x + y - l.checker.y) & 1) ? 0 : 255;
            } else if (inside(l.skinLight, x, y)) {
                r = kSampleSkinLight[0], g = kSampleSkinLight[1], b = kSampleSkinLight[2];
            } else if (inside(l.skinDark, x, y)) {
                r = kSampleSkinDark[0], g = kSampleSkinDark[1], b = kSampleSkinDark[2];
            } else if (inside(l.redRamp, x, y)) {
                r = rampAt(l.redRamp, x);
            } else if (inside(l.greenRamp, x, y)) {
                g = rampAt(l.greenRamp, x);
            } else if (inside(l.blueRamp, x, y)) {
                b = rampAt(l.blueRamp, x);
            }
            put(image, x, y, r, g, b);
        }
    }
    return image;
}

}  // namespace kivcli
