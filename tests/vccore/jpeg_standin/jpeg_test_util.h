// What the JPEG, PNG and file suites share: the test picture as an image,
// the stream makers, files, and whether the platform's fast codec is here.
#ifndef KIV_TESTS_JPEG_TEST_UTIL_H
#define KIV_TESTS_JPEG_TEST_UTIL_H

#include <dlfcn.h>
#include <string.h>

#include "support/image_ptr.h"
#include "support/log_capture.h"
#include "support/picture_streams.h"
#include "support/temp_dir.h"
#include "support/test_picture.h"

namespace jpegtest {

using namespace kivtest;

inline bool fastCodecInstalled() {
    void* handle = dlopen("libkivjpeginterface.so", RTLD_NOW);
    if (handle != nullptr) dlclose(handle);
    return handle != nullptr;
}

// An owning opaque RGBA image of the test picture.
inline ImagePtr makeRgba(int w, int h) {
    ImagePtr image(VCImage_createNew(w, h, VC_FORMAT_RGBA));
    Bytes pixels = makeTestPicture(w, h, true);
    memcpy(image->data, pixels.data(), pixels.size());
    return image;
}

}  // namespace jpegtest

#endif
