// A small built-in bitmap font for labelling pictures without a font library.
#ifndef TOOLS_KIVIMAGING_FONT_H
#define TOOLS_KIVIMAGING_FONT_H

#include <stdint.h>

#include "vccore/vc_image.h"

namespace kivcli {

// Glyph cell: 5 columns; rows 0-6 hold capitals and digits, rows 7-8 the
// descenders of g, j, p, q, y and the comma's tail.
constexpr int kGlyphWidth = 5;
constexpr int kGlyphHeight = 9;
constexpr int kGlyphAdvance = 6;  // one empty column between letters
constexpr int kFontLineHeight = 10;

// True for the printable ASCII range the font covers (space to '~').
bool fontHasGlyph(char c);

// Number of glyph table entries that are not rows of '#'/'.' of the glyph
// width (a check on the table itself).
int fontMalformedGlyphs();

// Whether the pixel (column, row) of a glyph is lit; characters without a
// glyph are drawn as '?'.
bool fontGlyphPixel(char c, int column, int row);

// Width in pixels of a line of text at a scale (no trailing gap).
int fontTextWidth(const char* text, int scale);

// Draws text with its top-left corner at (x, y) in an "RGBA" image, each font
// pixel a scale×scale square of `rgba` (bytes R, G, B, A). Clipped to the
// image; returns VC_ERROR_INVALID_PARAM for other formats or a scale below 1.
int fontDrawText(VCImage* image, int x, int y, const char* text, const uint8_t rgba[4], int scale);

}  // namespace kivcli

#endif
