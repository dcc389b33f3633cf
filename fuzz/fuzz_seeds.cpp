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

// PNG chunk checksum (CRC-32, reflected polynomial 0xEDB88320).
uint32_t crc32Of(const unsigned char* p, size_t n) {
    uint32_t crc = 0xFFFFFFFFu;
    for (size_t i = 0; i < n; ++i) {
        crc ^= p[i];
        for (int k = 0; k < 8; ++k) crc = (crc >> 1) ^ (0xEDB88320u & (0u - (crc & 1u)));
    }
    return crc ^ 0xFFFFFFFFu;
}

// A valid stream whose header is rewritten to promise width×height, so that
// the fuzzer starts inside that size class.
bool writeHuge(const std::string& path, const std::string& from, int width, int height) {
    FILE* f = fopen(from.c_str(), "rb");
    if (f == nullptr) return false;
    std::vector<unsigned char> bytes(1 << 16);
    bytes.resize(fread(bytes.data(), 1, bytes.size(), f));
    fclose(f);
    auto put16 = [&](size_t at, int v) {
        bytes[at] = static_cast<unsigned char>(v >> 8);
        bytes[at + 1] = static_cast<unsigned char>(v);
    };
    bool png = bytes.size() > 24 && bytes[1] == 'P';
    if (png) {
        put16(18, width);
        put16(22, height);
        uint32_t crc = crc32Of(&bytes[12], 17);  // the header chunk's type and fields
        put16(29, static_cast<int>(crc >> 16));
        put16(31, static_cast<int>(crc & 0xFFFF));
        return writeBytes(path, bytes.data(), bytes.size());
    }
    for (size_t i = 2; i + 8 < bytes.size(); ++i) {
        if (bytes[i] != 0xFF || bytes[i + 1] != 0xC0) continue;
        put16(i + 5, height);
        put16(i + 7, width);
        return writeBytes(path, bytes.data(), bytes.size());
    }
    return false;
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
    if (!writeHuge(dir + "/huge.jpg", dir + "/rgba.jpg", 30000, 30000)) ++failures;
    if (!writeHuge(dir + "/huge.png", dir + "/rgba.png", 20000, 20000)) ++failures;
    if (failures != 0) fprintf(stderr, "fuzz_seeds: %d seeds could not be written\n", failures);
    return failures == 0 ? 0 : 1;
}
