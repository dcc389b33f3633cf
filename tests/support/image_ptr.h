// The owning handle of a VCImage in tests: destroyed at the end of its scope.
#ifndef KIV_TESTS_SUPPORT_IMAGE_PTR_H
#define KIV_TESTS_SUPPORT_IMAGE_PTR_H

#include <memory>

#include "vccore/vc_image.h"

struct ImageDeleter {
    void operator()(VCImage* image) const { VCImage_destroy(image); }
};
using ImagePtr = std::unique_ptr<VCImage, ImageDeleter>;

#endif
