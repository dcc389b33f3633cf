// The tool's bitmap font: table integrity, glyph shapes, drawing and clipping.
#include <gtest/gtest.h>
#include <string.h>

#include <set>
#include <string>

#include "font.h"

namespace {

using namespace kivcli;

const uint8_t kWhite[4] = {255, 255, 255, 255};

std::string glyphBits(char c) {
    std::string bits;
    for (int r = 0; r < kGlyphHeight; r++) {
        for (int col = 0; col < kGlyphWidth; col++) bits += fontGlyphPixel(c, col, r) ? '#' : '.';
    }
    return bits;
}

const uint8_t* at(const VCImage* image, int x, int y) {
    return image->data + (static_cast<size_t>(y) * image->width + x) * 4;
}

bool lit(const VCImage* image, int x, int y) {
    return at(image, x, y)[0] == 255;
}

TEST(Font, TableCoversPrintableAsciiWithDistinctWellFormedGlyphs) {
    EXPECT_EQ(0, fontMalformedGlyphs());
    std::set<std::string> seen;
    for (char c = ' '; c <= '~'; c++) {
        ASSERT_TRUE(fontHasGlyph(c)) << c;
        std::string bits = glyphBits(c);
        if (c == ' ') {
            EXPECT_EQ(std::string(kGlyphWidth * kGlyphHeight, '.'), bits);
        } else {
            EXPECT_NE(std::string::npos, bits.find('#')) << "empty glyph for " << c;
        }
        // A copy-pasted row would make two characters look the same.
        EXPECT_TRUE(seen.insert(bits).second) << "glyph of '" << c << "' repeats another";
    }
    EXPECT_FALSE(fontHasGlyph('\t'));
    EXPECT_FALSE(fontHasGlyph('\x7f'));
    // Characters without a glyph draw as '?'.
    EXPECT_EQ(glyphBits('?'), glyphBits('\x01'));
}

TEST(Font, GlyphShapes) {
    // Lower-case g (not mirror-symmetric, so column or row order mix-ups show):
    // bowl on rows 2-6, tail on rows 7-8.
    EXPECT_EQ(
        "....."
        "....."
        ".####"
        "#...#"
        "#...#"
        "#...#"
        ".####"
        "....#"
        ".###.",
        glyphBits('g'));
    // Pixels outside the cell are never lit.
    EXPECT_FALSE(fontGlyphPixel('H', -1, 0));
    EXPECT_FALSE(fontGlyphPixel('H', kGlyphWidth, 0));
    EXPECT_FALSE(fontGlyphPixel('H', 0, kGlyphHeight));
    // Descenders reach row 7; capitals never go below row 6.
    auto below = [](char c, int row) {
        return glyphBits(c).find('#', row * kGlyphWidth) != std::string::npos;
    };
    for (char c : std::string("gjpqy")) EXPECT_TRUE(below(c, 7)) << c;
    for (char c = 'A'; c <= 'Z'; c++) EXPECT_FALSE(below(c, 7)) << c;
    // Zero and capital O differ by the zero's diagonal.
    EXPECT_TRUE(fontGlyphPixel('0', 2, 3));
    EXPECT_FALSE(fontGlyphPixel('O', 2, 3));
}

TEST(Font, TextWidth) {
    EXPECT_EQ(0, fontTextWidth("", 1));
    EXPECT_EQ(0, fontTextWidth(nullptr, 1));
    EXPECT_EQ(0, fontTextWidth("abc", 0));
    EXPECT_EQ(5, fontTextWidth("x", 1));
    EXPECT_EQ(6 * 10 - 1, fontTextWidth("0123456789", 1));
    EXPECT_EQ(2 * (6 * 3 - 1), fontTextWidth("403", 2));
}

TEST(Font, DrawsGlyphPixelsAtScaleAndAdvance) {
    VCImage* image = VCImage_createNew(40, 24, VC_FORMAT_RGBA);
    ASSERT_NE(nullptr, image);
    memset(image->data, 0, VCImage_size(image));
    const int x0 = 2, y0 = 3, scale = 2;
    ASSERT_EQ(VC_OK, fontDrawText(image, x0, y0, "A1", kWhite, scale));
    // Every image pixel matches the glyph pixel it falls on (or is background).
    for (int y = 0; y < image->height; y++) {
        for (int x = 0; x < image->width; x++) {
            bool expected = false;
            int gx = x - x0, gy = y - y0;
            if (gx >= 0 && gy >= 0) {
                int index = gx / (kGlyphAdvance * scale);
                int col = (gx % (kGlyphAdvance * scale)) / scale;
                int row = gy / scale;
                if (index < 2) expected = fontGlyphPixel("A1"[index], col, row);
            }
            ASSERT_EQ(expected, lit(image, x, y)) << "pixel " << x << "," << y;
        }
    }
    EXPECT_EQ(255, at(image, x0 + 2, y0)[3]);  // A's top row is .###.
    VCImage_destroy(image);
}

TEST(Font, ClipsAtEveryBorderAndRejectsBadArguments) {
    VCImage* image = VCImage_createNew(8, 8, VC_FORMAT_RGBA);
    ASSERT_NE(nullptr, image);
    memset(image->data, 0, VCImage_size(image));
    // Partly outside on all sides: no crash (ASan watches), visible part drawn.
    EXPECT_EQ(VC_OK, fontDrawText(image, -3, -4, "WW", kWhite, 3));
    EXPECT_EQ(VC_OK, fontDrawText(image, 6, 6, "M", kWhite, 2));
    EXPECT_TRUE(lit(image, 6, 6));  // M's top-left pixel
    EXPECT_EQ(VC_OK, fontDrawText(image, 100, 100, "X", kWhite, 1));

    EXPECT_EQ(VC_ERROR_INVALID_PARAM, fontDrawText(image, 0, 0, "X", kWhite, 0));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, fontDrawText(nullptr, 0, 0, "X", kWhite, 1));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, fontDrawText(image, 0, 0, nullptr, kWhite, 1));
    image->format = VC_FORMAT_BGRA;
    EXPECT_EQ(VC_ERROR_INVALID_PARAM, fontDrawText(image, 0, 0, "X", kWhite, 1));
    VCImage_destroy(image);
}

}  // namespace
