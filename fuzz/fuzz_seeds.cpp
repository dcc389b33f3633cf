// Writes the seed corpus of the decoder fuzzer: small valid JPEG and PNG
// files of the kinds the library reads. Usage: fuzz_seeds <directory>
#include <stdio.h>
#include <string.h>
#include <turbojpeg.h>

#include <string>
#include <vector>

#include "vccore/vc_file.h"
#include "vccore/vc_log.h"

namespace {

void quietLog(int, const char*, ...) {}

VCImage* picture(int w, int h, uint32_t format) {
    VCImage* image = VCImage_createNew(w, h, format);
    if (image == nullptr) return nullptr;
    for (uint32_t i = 0; i < image->size; ++i)
        image->data[i] = static_cast<unsigned char>((i * 37) ^ (i >> 5));
    return image;
}

bool writeBytes(const std::string& path, const unsigned char* data, unsigned long size) {
    FILE* f = fopen(path.c_str(), "wb");
    if (f == nullptr) return false;
    bool ok = fwrite(data, 1, size, f) == size;
    return fclose(f) == 0 && ok;
}

// Streams our encoder does not make: progressive and 4:4:4.
bool writeTurbo(const std::string& path, const VCImage* rgba, int subsampling, int flags) {
    tjhandle tj = tjInitCompress();
    unsigned char* jpeg = nullptr;
    unsigned long size = 0;
    bool ok = tjCompress2(tj, rgba->data, rgba->width, 0, rgba->height, TJPF_RGBA, &jpeg, &size,
                          subsampling, 80, flags) == 0 &&
              writeBytes(path, jpeg, size);
    tjFree(jpeg);
    tjDestroy(tj);
    return ok;
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 2) {
        fprintf(stderr, "usage: %s <directory>\n", argv[0]);
        return 2;
    }
    VF_LogMsg = quietLog;
    std::string dir = argv[1];
    struct Seed {
        const char* name;
        int w, h;
        uint32_t format;
        int quality;
    } seeds[] = {
        {"rgba.jpg", 32, 24, VC_FORMAT_RGBA, 90}, {"grey.jpg", 17, 9, VC_FORMAT_GREY, 75},
        {"nv21.jpg", 16, 16, VC_FORMAT_NV21, 60}, {"yuyv.jpg", 20, 6, VC_FORMAT_YUYV, 95},
        {"rgba.png", 13, 7, VC_FORMAT_RGBA, 85},  {"bgr.png", 8, 8, VC_FORMAT_BGR8, 85},
    };
    int failures = 0;
    for (const Seed& s : seeds) {
        VCImage* image = picture(s.w, s.h, s.format);
        std::string path = dir + "/" + s.name;
        if (image == nullptr || VCImage_saveToFile(image, path.c_str(), s.quality) != 0) ++failures;
        VCImage_destroy(image);
    }
    VCImage* rgba = picture(24, 16, VC_FORMAT_RGBA);
    if (!writeTurbo(dir + "/progressive.jpg", rgba, TJSAMP_420, TJFLAG_PROGRESSIVE)) ++failures;
    if (!writeTurbo(dir + "/full-chroma.jpg", rgba, TJSAMP_444, 0)) ++failures;
    VCImage_destroy(rgba);
    if (failures != 0) fprintf(stderr, "fuzz_seeds: %d seeds could not be written\n", failures);
    return failures == 0 ? 0 : 1;
}
