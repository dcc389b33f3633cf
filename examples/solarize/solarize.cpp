// Solarize: a CPU filter plug-in. Every colour value at or above "threshold"
// (0 to 256, default 128) is inverted; alpha is kept, and in NV21/NV12 only
// the luma is solarized (the chroma is copied).
//
// Install as <folder>/com.example.solarize.libsolarize.so in
// /data/DownFilters/Lib/ and select "com.example.solarize,libsolarize.so".
#include <stdlib.h>
#include <string.h>

#include <atomic>

#include <kivimaging/KivFilterPlugin.h>

namespace {

class Solarize : public KivFilterPlugin {
public:
    ~Solarize() override {}

    const char* getName() override { return "Solarize"; }
    const char* getDescription() override { return "Inverts the brightest tones"; }

    // No GL side.
    bool getDrawFlag() override { return true; }
    void setGLInfo(const GLInfo*) override {}
    int compileFragmentShader(int) override { return -1; }
    void onDrawFrame(int, int, bool) override {}
    int releaseGL(unsigned int** textures, int* count) override {
        *textures = nullptr;
        *count = 0;
        return 0;
    }

    int process(const unsigned char* in, unsigned char* out, int width, int height,
                int format) override {
        if (in == nullptr || out == nullptr || width < 1 || height < 1) return -3;
        const size_t pixels = static_cast<size_t>(width) * static_cast<size_t>(height);
        const int threshold = mThreshold.load();
        switch (format) {
            case KIV_PLUGIN_FORMAT_RGBA:
            case KIV_PLUGIN_FORMAT_BGRA:
                for (size_t i = 0; i < pixels * 4; ++i) {
                    out[i] = (i & 3) == 3 ? in[i] : solarize(in[i], threshold);
                }
                return 0;
            case KIV_PLUGIN_FORMAT_NV21:
            case KIV_PLUGIN_FORMAT_NV12:
                for (size_t i = 0; i < pixels; ++i) out[i] = solarize(in[i], threshold);
                memcpy(out + pixels, in + pixels, (3 * pixels + 1) / 2 - pixels);
                return 0;
            default:
                return -6;
        }
    }

    int getCapabilities() override { return KIV_PLUGIN_CAP_CPU; }
    int getSupportedFormats() override {
        return KIV_PLUGIN_FORMAT_RGBA | KIV_PLUGIN_FORMAT_BGRA | KIV_PLUGIN_FORMAT_NV21 |
               KIV_PLUGIN_FORMAT_NV12;
    }

    void setOption(const char* name, int value) override {
        if (strcmp(name, "threshold") == 0) setThreshold(value);
    }
    // "parameter" carries "threshold=NN".
    void setOption(const char* name, const char* value) override {
        if (strcmp(name, "parameter") != 0) return;
        const char* key = strstr(value, "threshold=");
        if (key != nullptr) setThreshold(atoi(key + strlen("threshold=")));
    }

private:
    static unsigned char solarize(unsigned char value, int threshold) {
        return value >= threshold ? static_cast<unsigned char>(255 - value) : value;
    }
    void setThreshold(int value) { mThreshold = value < 0 ? 0 : value > 256 ? 256 : value; }

    std::atomic<int> mThreshold{128};
};

}  // namespace

KIV_FILTER_PLUGIN_EXPORT KivFilterPlugin* Create() {
    return new Solarize();
}

KIV_FILTER_PLUGIN_EXPORT void Destroy(KivFilterPlugin* plugin) {
    delete plugin;
}
