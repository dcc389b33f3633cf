// A pixel rectangle, shared by the picture layouts of the tool.
#ifndef TOOLS_KIVIMAGING_RECT_H
#define TOOLS_KIVIMAGING_RECT_H

namespace kivcli {

struct Rect {
    int x, y, width, height;
};

}  // namespace kivcli

#endif
