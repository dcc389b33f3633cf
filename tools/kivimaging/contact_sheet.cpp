#include "contact_sheet.h"

#include <limits.h>
#include <string.h>

#include <string>

#include "vccore/vc_geometry.h"

namespace kivcli {

const uint8_t kSheetBackground[4] = {28, 28, 32, 255};
const uint8_t kSheetLabelColour[4] = {235, 235, 235, 255};

bool sheetLayout(int count, int thumbWidth, int thumbHeight, int columns, SheetLayout* layout) {
    if (layout == nullptr || count < 1 || thumbWidth < 1 || thumbHeight < 1 || columns < 1) {
        return false;
    }
    if (columns > count) columns = count;
    int rows = (count + columns - 1) / columns;
    long long width =
        static_cast<long long>(columns) * (thumbWidth + kSheetPadding) + kSheetPadding;
    long long height =
        static_cast<long long>(rows) * (thumbHeight + kSheetLabelHeight + kSheetPadding) +
        kSheetPadding;
    if (width > 16384 || height > 65536 || width * height * 4 > INT_MAX) return false;
    *layout = {count,
               columns,
               rows,
               thumbWidth,
               thumbHeight,
               static_cast<int>(width),
               static_cast<int>(height)};
    return true;
}

Rect sheetThumbRect(const SheetLayout& layout, int index) {
    int column = index % layout.columns;
    int row = index / layout.columns;
    return {kSheetPadding + column * (layout.thumbWidth + kSheetPadding),
            kSheetPadding + row * (layout.thumbHeight + kSheetLabelHeight + kSheetPadding),
            layout.thumbWidth, layout.thumbHeight};
}

Rect sheetLabelRect(const SheetLayout& layout, int index) {
    Rect thumb = sheetThumbRect(layout, index);
    return {thumb.x, thumb.y + thumb.height + kSheetLabelGap, thumb.width, kFontLineHeight};
}

int sheetThumbHeight(int sourceWidth, int sourceHeight, int thumbWidth) {
    if (sourceWidth < 1 || sourceHeight < 1 || thumbWidth < 1) return 1;
    long long h =
        (static_cast<long long>(sourceHeight) * thumbWidth + sourceWidth / 2) / sourceWidth;
    return h < 1 ? 1 : static_cast<int>(h);
}

VCImage* sheetCreate(const SheetLayout& layout) {
    VCImage* sheet = VCImage_createNew(layout.width, layout.height, VC_FORMAT_RGBA);
    if (sheet == nullptr) return nullptr;
    size_t pixels = static_cast<size_t>(layout.width) * layout.height;
    for (size_t i = 0; i < pixels; i++) memcpy(sheet->data + i * 4, kSheetBackground, 4);
    return sheet;
}

int sheetPlace(VCImage* sheet, const SheetLayout& layout, int index, const VCImage* thumb,
               const char* label) {
    if (sheet == nullptr || thumb == nullptr || label == nullptr) return VC_ERROR_NULL_PARAM;
    if (index < 0 || index >= layout.count || thumb->width != layout.thumbWidth ||
        thumb->height != layout.thumbHeight) {
        return VC_ERROR_INVALID_PARAM;
    }
    Rect cell = sheetThumbRect(layout, index);
    int rc = VCImage_drawImage(thumb, sheet, cell.x, cell.y);
    if (rc != VC_OK) return rc;

    std::string text = label;
    if (fontTextWidth(text.c_str(), 1) > layout.thumbWidth) {
        while (!text.empty() && fontTextWidth((text + "..").c_str(), 1) > layout.thumbWidth) {
            text.pop_back();
        }
        text += "..";
    }
    Rect where = sheetLabelRect(layout, index);
    return fontDrawText(sheet, where.x, where.y, text.c_str(), kSheetLabelColour, 1);
}

}  // namespace kivcli
