// Pictures as camera frames: each decoded, stretched to the camera's size and
// converted to NV21 once, then kept while they fit in kMaxCachedBytes (a
// folder larger than that is decoded again as it comes round).
#include <dirent.h>
#include <string.h>
#include <strings.h>

#include <algorithm>
#include <memory>

#include "kivhost/VirtualCamera.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_file.h"
#include "vccore/vc_geometry.h"
#include "vccore/vc_log.h"

namespace kivhost {

namespace {

const size_t kMaxCachedBytes = (size_t)256 << 20;

struct ImageDeleter {
    void operator()(VCImage* image) const { VCImage_destroy(image); }
};
using Image = std::unique_ptr<VCImage, ImageDeleter>;

class Pictures : public VirtualCameraSource {
public:
    Pictures(std::vector<std::string> paths, int width, int height)
        : mPaths(std::move(paths)), mWidth(width), mHeight(height), mCache(mPaths.size()) {}

    // Decodes what fits in the cache; false when no picture can be read.
    bool load() {
        bool any = false;
        size_t bytes = 0;
        for (size_t i = 0; i < mPaths.size(); ++i) {
            Image frame = decode(i);
            if (frame == nullptr) continue;
            any = true;
            if (bytes + frame->size <= kMaxCachedBytes) {
                bytes += frame->size;
                mCache[i] = std::move(frame);
            }
        }
        return any;
    }

    bool render(uint64_t index, VCImage* frame) override {
        // A picture that cannot be read is skipped.
        for (size_t tries = 0; tries < mPaths.size(); ++tries) {
            const size_t i = (size_t)((index + tries) % mPaths.size());
            Image decoded;
            const VCImage* picture = mCache[i].get();
            if (picture == nullptr) {
                decoded = decode(i);
                picture = decoded.get();
            }
            if (picture == nullptr) continue;
            memcpy(frame->data, picture->data, VCImage_size(picture));
            return true;
        }
        return false;
    }

private:
    Image decode(size_t i) {
        Image rgba(VCImage_createEmpty(0, 0, VC_FORMAT_RGBA));
        if (rgba == nullptr || VCImage_loadFromFile(rgba.get(), mPaths[i].c_str()) != 0) {
            VF_LogMsg(VF_LOG_ERROR, "VirtualCamera: cannot read the picture %s", mPaths[i].c_str());
            return nullptr;
        }
        Image sized(VCImage_createEmpty(mWidth, mHeight, VC_FORMAT_RGBA));
        Image nv21(VCImage_createNew(mWidth, mHeight, VC_FORMAT_NV21));
        if (sized == nullptr || nv21 == nullptr || VCImage_scale(rgba.get(), sized.get()) != 0 ||
            VCImage_convert(sized.get(), nv21.get()) != 0) {
            return nullptr;
        }
        return nv21;
    }

    const std::vector<std::string> mPaths;
    const int mWidth;
    const int mHeight;
    std::vector<Image> mCache;
};

bool isPicture(const char* name) {
    const char* dot = strrchr(name, '.');
    return dot != nullptr && (strcasecmp(dot, ".jpg") == 0 || strcasecmp(dot, ".jpeg") == 0 ||
                              strcasecmp(dot, ".png") == 0);
}

}  // namespace

std::unique_ptr<VirtualCameraSource> VirtualCamera_pictures(const std::vector<std::string>& paths,
                                                            int width, int height) {
    if (paths.empty() || width < 2 || height < 2 || ((width | height) & 1) != 0) return nullptr;
    std::unique_ptr<Pictures> source(new Pictures(paths, width, height));
    if (!source->load()) return nullptr;
    return source;
}

std::unique_ptr<VirtualCameraSource> VirtualCamera_folder(const std::string& folder, int width,
                                                          int height) {
    DIR* dir = opendir(folder.c_str());
    if (dir == nullptr) {
        VF_LogMsg(VF_LOG_ERROR, "VirtualCamera: cannot open the folder %s", folder.c_str());
        return nullptr;
    }
    std::vector<std::string> paths;
    while (const dirent* entry = readdir(dir)) {
        if (isPicture(entry->d_name)) paths.push_back(folder + "/" + entry->d_name);
    }
    closedir(dir);
    std::sort(paths.begin(), paths.end());
    if (paths.empty()) {
        VF_LogMsg(VF_LOG_ERROR, "VirtualCamera: no pictures in %s", folder.c_str());
        return nullptr;
    }
    return VirtualCamera_pictures(paths, width, height);
}

}  // namespace kivhost
