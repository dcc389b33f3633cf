// A CPU filter plug-in built from the installed SDK header alone: XORs the
// colour bytes of RGBA pixels with a key ("parameter" "key=N", default 255),
// keeping alpha.
#include <stdlib.h>
#include <string.h>

#include <kivimaging/KivFilterPlugin.h>

namespace {

class XorFilter : public KivFilterPlugin {
public:
    const char* getName() override { return "Xor"; }
    const char* getDescription() override { return "XORs colour bytes with a key"; }
    bool getDrawFlag() override { return true; }
    void setGLInfo(const GLInfo*) override {}
    int compileFragmentShader(int) override { return -1; }
    void onDrawFrame(int, int, bool) override {}

    int process(const unsigned char* in, unsigned char* out, int width, int height,
                int format) override {
        if (format != KIV_PLUGIN_FORMAT_RGBA) return -6;
        const long bytes = 4L * width * height;
        for (long i = 0; i < bytes; ++i) out[i] = (i & 3) == 3 ? in[i] : in[i] ^ mKey;
        return 0;
    }

    int getCapabilities() override { return KIV_PLUGIN_CAP_CPU; }
    int getSupportedFormats() override { return KIV_PLUGIN_FORMAT_RGBA; }
    void setOption(const char*, int) override {}
    void setOption(const char* name, const char* value) override {
        const char* key = strcmp(name, "parameter") == 0 ? strstr(value, "key=") : nullptr;
        if (key != nullptr) mKey = static_cast<unsigned char>(atoi(key + 4));
    }
    int releaseGL(unsigned int** textures, int* count) override {
        *textures = nullptr;
        *count = 0;
        return 0;
    }

private:
    unsigned char mKey = 255;
};

}  // namespace

KIV_FILTER_PLUGIN_EXPORT KivFilterPlugin* Create() {
    return new XorFilter();
}

KIV_FILTER_PLUGIN_EXPORT void Destroy(KivFilterPlugin* plugin) {
    delete plugin;
}
