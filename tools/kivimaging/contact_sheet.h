// The contact sheet of the gallery command: a grid of equally sized
// thumbnails, each with a one-line label underneath.
#ifndef TOOLS_KIVIMAGING_CONTACT_SHEET_H
#define TOOLS_KIVIMAGING_CONTACT_SHEET_H

#include "font.h"
#include "rect.h"
#include "vccore/vc_image.h"

namespace kivcli {

constexpr int kSheetPadding = 8;
constexpr int kSheetLabelGap = 3;  // between a thumbnail and its label
constexpr int kSheetLabelHeight = kSheetLabelGap + kFontLineHeight;
constexpr int kSheetDefaultColumns = 6;
extern const uint8_t kSheetBackground[4];
extern const uint8_t kSheetLabelColour[4];

// Cells run left to right, then top to bottom; padding surrounds every cell.
struct SheetLayout {
    int count;
    int columns;
    int rows;
    int thumbWidth;
    int thumbHeight;
    int width;
    int height;
};

// Fails (false) for a count, thumbnail side or column count below 1, or a
// sheet too large to address. Fewer cells than columns narrow the sheet.
bool sheetLayout(int count, int thumbWidth, int thumbHeight, int columns, SheetLayout* layout);

Rect sheetThumbRect(const SheetLayout& layout, int index);
Rect sheetLabelRect(const SheetLayout& layout, int index);

// Thumbnail size for a source picture: thumbWidth wide, height from the
// source's aspect ratio (at least 1).
int sheetThumbHeight(int sourceWidth, int sourceHeight, int thumbWidth);

// A new "RGBA" sheet filled with the background colour, or null.
VCImage* sheetCreate(const SheetLayout& layout);

// Pastes an "RGBA" thumbnail of the layout's size into cell `index` and writes
// its label, cut short with ".." when it is wider than the cell.
int sheetPlace(VCImage* sheet, const SheetLayout& layout, int index, const VCImage* thumb,
               const char* label);

}  // namespace kivcli

#endif
