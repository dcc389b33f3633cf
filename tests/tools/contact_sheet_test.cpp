// Contact-sheet geometry and placement (the pasting itself is the image core's).
#include <gtest/gtest.h>
#include <string.h>

#include "contact_sheet.h"

namespace {

using namespace kivcli;

TEST(ContactSheet, LayoutArithmetic) {
    SheetLayout l;
    // 13 thumbnails of 40x30 in 5 columns: 3 rows; padding 8, label 3 + 10.
    ASSERT_TRUE(sheetLayout(13, 40, 30, 5, &l));
    EXPECT_EQ(5, l.columns);
    EXPECT_EQ(3, l.rows);
    EXPECT_EQ(5 * 48 + 8, l.width);
    EXPECT_EQ(3 * (30 + 13 + 8) + 8, l.height);
    // Exactly full rows do not add an empty one.
    ASSERT_TRUE(sheetLayout(10, 40, 30, 5, &l));
    EXPECT_EQ(2, l.rows);
    // Fewer thumbnails than columns narrow the sheet.
    ASSERT_TRUE(sheetLayout(2, 40, 30, 6, &l));
    EXPECT_EQ(2, l.columns);
    EXPECT_EQ(2 * 48 + 8, l.width);
    EXPECT_EQ(1, l.rows);

    // Zero counts or sizes, and a sheet far too large, are refused.
    const int bad[][4] = {
        {0, 40, 30, 5}, {3, 0, 30, 5}, {3, 40, 0, 5}, {3, 40, 30, 0}, {1000000, 1024, 1024, 32}};
    for (const auto& b : bad) EXPECT_FALSE(sheetLayout(b[0], b[1], b[2], b[3], &l)) << b[0];
    EXPECT_FALSE(sheetLayout(3, 40, 30, 5, nullptr));
}

TEST(ContactSheet, CellPositions) {
    SheetLayout l;
    ASSERT_TRUE(sheetLayout(7, 50, 20, 3, &l));
    Rect first = sheetThumbRect(l, 0);
    EXPECT_EQ(8, first.x);
    EXPECT_EQ(8, first.y);
    EXPECT_EQ(50, first.width);
    EXPECT_EQ(20, first.height);
    Rect fifth = sheetThumbRect(l, 4);  // row 1, column 1
    EXPECT_EQ(8 + 58, fifth.x);
    EXPECT_EQ(8 + 20 + 13 + 8, fifth.y);
    Rect label = sheetLabelRect(l, 4);
    EXPECT_EQ(fifth.x, label.x);
    EXPECT_EQ(fifth.y + 20 + 3, label.y);
    // The last cell lies inside the sheet with its padding.
    Rect last = sheetLabelRect(l, 6);
    EXPECT_EQ(l.height - 8, last.y + last.height);

    EXPECT_EQ(133, sheetThumbHeight(960, 640, 200));
    EXPECT_EQ(150, sheetThumbHeight(4000, 3000, 200));
    EXPECT_EQ(1, sheetThumbHeight(10000, 1, 16));
    EXPECT_EQ(1, sheetThumbHeight(0, 10, 16));
}

TEST(ContactSheet, PlacesThumbnailAndLabel) {
    SheetLayout l;
    ASSERT_TRUE(sheetLayout(4, 30, 10, 2, &l));
    VCImage* sheet = sheetCreate(l);
    ASSERT_NE(nullptr, sheet);
    ASSERT_EQ(l.width, sheet->width);
    ASSERT_EQ(l.height, sheet->height);
    EXPECT_EQ(0, memcmp(sheet->data, kSheetBackground, 4));

    VCImage* thumb = VCImage_createNew(30, 10, VC_FORMAT_RGBA);
    ASSERT_NE(nullptr, thumb);
    for (int i = 0; i < 300; i++) {
        const uint8_t red[4] = {250, 10, 20, 255};
        memcpy(thumb->data + i * 4, red, 4);
    }
    // Cell 3: second row, second column.
    ASSERT_EQ(VC_OK, sheetPlace(sheet, l, 3, thumb, "403 Negative"));
    Rect cell = sheetThumbRect(l, 3);
    auto px = [&](int x, int y) {
        return sheet->data + (static_cast<size_t>(y) * sheet->width + x) * 4;
    };
    EXPECT_EQ(250, px(cell.x, cell.y)[0]);
    EXPECT_EQ(20, px(cell.x + 29, cell.y + 9)[2]);
    EXPECT_EQ(0, memcmp(px(cell.x - 1, cell.y), kSheetBackground, 4));
    EXPECT_EQ(0, memcmp(px(cell.x + 30, cell.y), kSheetBackground, 4));
    // The label is long for 30 pixels: cut to "403.." (5 glyphs, 29 pixels wide);
    // '4' has its lit pixel at column 3 of the top row.
    Rect label = sheetLabelRect(l, 3);
    EXPECT_EQ(0, memcmp(px(label.x + 3, label.y), kSheetLabelColour, 4));
    for (int y = label.y; y < label.y + kFontLineHeight; y++)
        EXPECT_EQ(0, memcmp(px(label.x + 29, y), kSheetBackground, 4)) << "label past its cell";
    // The first dot of ".." is glyph 3 (18 pixels in), lit at columns 1-2 of rows 5-6;
    // the third glyph is '3', whose top row is all lit.
    EXPECT_EQ(0, memcmp(px(label.x + 18 + 1, label.y + 5), kSheetLabelColour, 4));
    EXPECT_EQ(0, memcmp(px(label.x + 18 + 1, label.y + 4), kSheetBackground, 4));
    EXPECT_EQ(0, memcmp(px(label.x + 12 + 4, label.y), kSheetLabelColour, 4));

    // Wrong thumbnail size or index is refused.
    EXPECT_EQ(VC_ERROR_INVALID_PARAM, sheetPlace(sheet, l, 4, thumb, "x"));
    EXPECT_EQ(VC_ERROR_INVALID_PARAM, sheetPlace(sheet, l, -1, thumb, "x"));
    VCImage* wrong = VCImage_createNew(29, 10, VC_FORMAT_RGBA);
    EXPECT_EQ(VC_ERROR_INVALID_PARAM, sheetPlace(sheet, l, 0, wrong, "x"));
    EXPECT_EQ(VC_ERROR_NULL_PARAM, sheetPlace(sheet, l, 0, nullptr, "x"));
    VCImage_destroy(wrong);
    VCImage_destroy(thumb);
    VCImage_destroy(sheet);
}

}  // namespace
