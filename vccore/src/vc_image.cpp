#include "vccore/vc_image.h"

#include <limits.h>
#include <stdlib.h>
#include <string.h>

#include "vc_image_layout.h"

VCImage::~VCImage() {
    VCImage_deallocate(this);
}

extern "C" int VCImage_isRGB(uint32_t format) {
    switch (format) {
        case VC_FORMAT_RGBA:
        case VC_FORMAT_BGRA:
        case VC_FORMAT_ARGB:
        case VC_FORMAT_ABGR:
        case VC_FORMAT_RGB8:
        case VC_FORMAT_BGR8:
            return 1;
        default:
            return 0;
    }
}

extern "C" int VCImage_isYUV420(uint32_t format) {
    switch (format) {
        case VC_FORMAT_NV12:
        case VC_FORMAT_NV21:
        case VC_FORMAT_YV12:
        case VC_FORMAT_YUVP:
            return 1;
        default:
            return 0;
    }
}

extern "C" int VCImage_isYUV(uint32_t format) {
    switch (format) {
        case VC_FORMAT_GREY:
        case VC_FORMAT_YUYV:
        case VC_FORMAT_YVYU:
            return 1;
        default:
            return VCImage_isYUV420(format);
    }
}

extern "C" uint32_t VCImage_requiredSize(int width, int height, uint32_t format) {
    if (width < 1 || height < 1) return 0;
    uint64_t pixels = static_cast<uint64_t>(width) * static_cast<uint64_t>(height);
    uint64_t product;
    switch (format) {
        case VC_FORMAT_RGBA:
        case VC_FORMAT_BGRA:
        case VC_FORMAT_ARGB:
        case VC_FORMAT_ABGR:
            product = 4 * pixels;
            break;
        case VC_FORMAT_RGB8:
        case VC_FORMAT_BGR8:
            product = 3 * pixels;
            break;
        case VC_FORMAT_GREY:
            product = pixels;
            break;
        case VC_FORMAT_YUYV:
        case VC_FORMAT_YVYU:
            product = 2 * pixels;
            break;
        case VC_FORMAT_NV12:
        case VC_FORMAT_NV21:
        case VC_FORMAT_YV12:
        case VC_FORMAT_YUVP:
            product = 3 * pixels;
            break;
        default:
            return 0;
    }
    // A product that does not fit the 32-bit size field is no size at all.
    if (product > UINT32_MAX) return 0;
    if (VCImage_isYUV420(format)) return static_cast<uint32_t>((product + 1) / 2);
    return static_cast<uint32_t>(product);
}

extern "C" uint32_t VCImage_size(const VCImage* image) {
    if (image == nullptr) return 0;
    if (image->size != 0) return image->size;
    return VCImage_requiredSize(image->width, image->height, image->format);
}

extern "C" VCImage* VCImage_createEmpty(int width, int height, uint32_t format) {
    VCImage* image = new VCImage;
    image->width = width;
    image->height = height;
    image->format = format;
    return image;
}

extern "C" VCImage* VCImage_createNew(int width, int height, uint32_t format) {
    uint32_t size = VCImage_requiredSize(width, height, format);
    if (size == 0) return nullptr;
    unsigned char* data = static_cast<unsigned char*>(malloc(size));
    if (data == nullptr) return nullptr;
    VCImage* image = VCImage_createEmpty(width, height, format);
    image->data = data;
    image->size = size;
    return image;
}

extern "C" VCImage* VCImage_createWrap(unsigned char* data, int width, int height, uint32_t format,
                                       int size, uint32_t uvOffset) {
    VCImage* image = VCImage_createEmpty(width, height, format);
    if (data != nullptr) {
        image->data = data;
        image->wrapped = 1;
        image->size = size >= 0 ? static_cast<uint32_t>(size) : 0;
        image->uvOffset = uvOffset;
    }
    return image;
}

extern "C" int VCImage_allocate(VCImage* image) {
    if (image == nullptr) return VC_REPORT(VC_ERROR_NULL_PARAM);
    uint32_t size = VCImage_size(image);
    if (image->data != nullptr) {
        if (size > INT_MAX) return VC_REPORT(VC_ERROR_INVALID_SIZE);
        return static_cast<int>(size);
    }
    if (size == 0) return VC_REPORT(VC_ERROR_INVALID_PARAM);
    if (size > INT_MAX) return VC_REPORT(VC_ERROR_INVALID_SIZE);
    unsigned char* data = static_cast<unsigned char*>(malloc(size));
    if (data == nullptr) return VC_REPORT(VC_ERROR_ALLOC_FAILED);
    image->data = data;
    image->wrapped = 0;
    image->size = size;
    image->uvOffset = 0;
    return static_cast<int>(size);
}

extern "C" int VCImage_wrap(VCImage* image, unsigned char* data, int size, uint32_t uvOffset) {
    if (image == nullptr || data == nullptr) return VC_REPORT(VC_ERROR_NULL_PARAM);
    VCImage_deallocate(image);
    image->data = data;
    image->wrapped = 1;
    image->size = size > 0 ? static_cast<uint32_t>(size) : 0;
    image->uvOffset = uvOffset;
    if (size > 0) return size;
    uint32_t computed = VCImage_size(image);
    if (computed > INT_MAX) return VC_REPORT(VC_ERROR_INVALID_SIZE);
    return static_cast<int>(computed);
}

extern "C" void VCImage_deallocate(VCImage* image) {
    if (image == nullptr || image->data == nullptr) return;
    if (!image->wrapped) free(image->data);
    image->data = nullptr;
    image->wrapped = 0;
    image->size = 0;
    image->uvOffset = 0;
}

extern "C" void VCImage_reset(VCImage* image) {
    if (image == nullptr) return;
    VCImage_deallocate(image);
    image->width = 0;
    image->height = 0;
    image->format = 0;
}

extern "C" VCImage* VCImage_clone(const VCImage* image) {
    if (image == nullptr) return nullptr;
    VCImage* copy = VCImage_createNew(image->width, image->height, image->format);
    if (copy == nullptr) return nullptr;
    if (image->data == nullptr) return copy;
    if (VCImage_isYUV420(image->format) && image->uvOffset != 0) {
        // Gather a displaced chroma plane behind the luma plane.
        size_t luma = static_cast<size_t>(image->width) * image->height;
        size_t chroma = luma / 2;
        // A size field that is set bounds what may be read; without one the
        // offset is all there is to go by.
        if (image->size != 0 &&
            (luma > image->size || static_cast<uint64_t>(image->uvOffset) + chroma > image->size)) {
            VCImage_destroy(copy);
            return nullptr;
        }
        memcpy(copy->data, image->data, luma);
        memcpy(copy->data + luma, image->data + image->uvOffset, chroma);
    } else {
        // Never read past the source or write past the copy, whatever the size field says.
        size_t n = VCImage_size(image);
        if (n > copy->size) n = copy->size;
        memcpy(copy->data, image->data, n);
    }
    return copy;
}

extern "C" VCImage* VCImage_cloneHeader(const VCImage* image) {
    if (image == nullptr) return nullptr;
    return VCImage_createEmpty(image->width, image->height, image->format);
}

extern "C" void VCImage_destroy(VCImage* image) {
    delete image;
}

bool VCImage_rgbLayout(uint32_t format, VCRgbLayout* layout) {
    switch (format) {
        case VC_FORMAT_RGBA:
            *layout = {4, 0, 1, 2, 3};
            return true;
        case VC_FORMAT_BGRA:
            *layout = {4, 2, 1, 0, 3};
            return true;
        case VC_FORMAT_ARGB:
            *layout = {4, 1, 2, 3, 0};
            return true;
        case VC_FORMAT_ABGR:
            *layout = {4, 3, 2, 1, 0};
            return true;
        case VC_FORMAT_RGB8:
            *layout = {3, 0, 1, 2, -1};
            return true;
        case VC_FORMAT_BGR8:
            *layout = {3, 2, 1, 0, -1};
            return true;
        default:
            return false;
    }
}

bool VCImage_yuvLayout(const VCImage* image, VCYuvLayout* layout) {
    if (image == nullptr) return false;
    uint32_t luma = static_cast<uint32_t>(image->width) * static_cast<uint32_t>(image->height);
    uint32_t yEnd = image->uvOffset != 0 ? image->uvOffset : luma;
    uint32_t quarter = luma / 4;
    switch (image->format) {
        case VC_FORMAT_NV12:
            *layout = {yEnd, yEnd + 1, 1, 2};
            return true;
        case VC_FORMAT_NV21:
            *layout = {yEnd + 1, yEnd, 1, 2};
            return true;
        case VC_FORMAT_YV12:
            *layout = {yEnd + quarter, yEnd, 1, 1};
            return true;
        case VC_FORMAT_YUVP:
            *layout = {yEnd, yEnd + quarter, 1, 1};
            return true;
        case VC_FORMAT_YUYV:
            *layout = {1, 3, 2, 4};
            return true;
        case VC_FORMAT_YVYU:
            *layout = {3, 1, 2, 4};
            return true;
        case VC_FORMAT_GREY:
            *layout = {0, 0, 1, 0};
            return true;
        default:
            return false;
    }
}
