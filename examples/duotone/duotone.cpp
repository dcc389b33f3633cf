// Duotone: a GL filter plug-in. Each pixel's luma picks a colour from a
// gradient (deep blue shadows, red mid-tones, pale yellow highlights) held in
// a 256x1 lookup texture; the result is mixed with the picture by "strength"
// (0 to 100, default 100).
//
// Install as <folder>/com.example.duotone.libduotone.so in /data/DownFilters/Lib/
// and select the effect "com.example.duotone,libduotone.so".
#include <GLES2/gl2.h>
#include <stdlib.h>
#include <string.h>

#include <atomic>

#include <kivimaging/KivFilterPlugin.h>

namespace {

const char kFragmentShader[] =
    "#extension GL_OES_EGL_image_external : require\n"
    "#ifdef GL_FRAGMENT_PRECISION_HIGH\n"
    "precision highp float;\n"
    "#else\n"
    "precision mediump float;\n"
    "#endif\n"
    "uniform samplerExternalOES texSampler;\n"
    "uniform sampler2D duotoneGradient;\n"
    "uniform float duotoneStrength;\n"
    "varying highp vec2 v_texcoord;\n"
    "void main() {\n"
    "  vec4 color = texture2D(texSampler, v_texcoord);\n"
    "  float luma = dot(color.rgb, vec3(0.299, 0.587, 0.114));\n"
    "  vec3 tone = texture2D(duotoneGradient, vec2((luma * 255.0 + 0.5) / 256.0, 0.5)).rgb;\n"
    "  gl_FragColor = vec4(mix(color.rgb, tone, duotoneStrength), color.a);\n"
    "}\n";

// The gradient's stops: index 0, 128 and 255.
const unsigned char kStops[3][3] = {{25, 20, 70}, {200, 80, 90}, {255, 235, 170}};

class Duotone : public KivFilterPlugin {
public:
    ~Duotone() override {}

    const char* getName() override { return "Duotone"; }
    const char* getDescription() override {
        return "Maps tones to a blue, red and yellow gradient";
    }
    // The library draws the quad; onDrawFrame only binds the gradient.
    bool getDrawFlag() override { return true; }

    void setGLInfo(const GLInfo* info) override {
        mProgram = info->mProgramId;
        mUnit = info->mTextureUnit;
    }

    int compileFragmentShader(int) override {
        const char* source = kFragmentShader;
        GLuint shader = glCreateShader(GL_FRAGMENT_SHADER);
        if (shader == 0) return -1;
        glShaderSource(shader, 1, &source, nullptr);
        glCompileShader(shader);
        GLint compiled = 0;
        glGetShaderiv(shader, GL_COMPILE_STATUS, &compiled);
        if (!compiled) {
            glDeleteShader(shader);
            return -1;
        }
        return static_cast<int>(shader);
    }

    void onDrawFrame(int, int, bool) override {
        if (mUnit < 0) return;  // no unit to draw with: the shader samples nothing
        glActiveTexture(GL_TEXTURE0 + static_cast<GLenum>(mUnit));
        if (mGradient == 0) makeGradient();
        glBindTexture(GL_TEXTURE_2D, mGradient);
        glUniform1i(glGetUniformLocation(mProgram, "duotoneGradient"), mUnit);
        glUniform1f(glGetUniformLocation(mProgram, "duotoneStrength"), mStrength.load() / 100.0f);
        // The library's own texture work continues on unit 0.
        glActiveTexture(GL_TEXTURE0);
    }

    int process(const unsigned char*, unsigned char*, int, int, int) override { return -1; }
    int getCapabilities() override { return KIV_PLUGIN_CAP_GL; }
    int getSupportedFormats() override { return 0; }

    void setOption(const char* name, int value) override {
        if (strcmp(name, "strength") == 0) setStrength(value);
    }
    // "parameter" carries "strength=NN".
    void setOption(const char* name, const char* value) override {
        if (strcmp(name, "parameter") != 0) return;
        const char* key = strstr(value, "strength=");
        if (key != nullptr) setStrength(atoi(key + strlen("strength=")));
    }

    int releaseGL(unsigned int** textures, int* count) override {
        mReleased = mGradient;
        mGradient = 0;
        *textures = &mReleased;
        *count = mReleased != 0 ? 1 : 0;
        return 0;
    }

private:
    void setStrength(int value) { mStrength = value < 0 ? 0 : value > 100 ? 100 : value; }

    void makeGradient() {
        unsigned char texels[256 * 4];
        for (int i = 0; i < 256; ++i) {
            // Two linear runs: stop 0 to 1 over 0..128, stop 1 to 2 over 128..255.
            const int run = i < 128 ? 0 : 1;
            const int from = run == 0 ? 0 : 128;
            const int length = run == 0 ? 128 : 127;
            for (int c = 0; c < 3; ++c) {
                const int a = kStops[run][c];
                const int b = kStops[run + 1][c];
                texels[i * 4 + c] = static_cast<unsigned char>(
                    a + ((b - a) * (i - from) * 2 + length) / (2 * length));
            }
            texels[i * 4 + 3] = 255;
        }
        glGenTextures(1, &mGradient);
        glBindTexture(GL_TEXTURE_2D, mGradient);
        glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MIN_FILTER, GL_NEAREST);
        glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MAG_FILTER, GL_NEAREST);
        glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_S, GL_CLAMP_TO_EDGE);
        glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_T, GL_CLAMP_TO_EDGE);
        glTexImage2D(GL_TEXTURE_2D, 0, GL_RGBA, 256, 1, 0, GL_RGBA, GL_UNSIGNED_BYTE, texels);
    }

    GLuint mProgram = 0;
    int mUnit = -1;
    GLuint mGradient = 0;
    unsigned int mReleased = 0;
    std::atomic<int> mStrength{100};
};

}  // namespace

KIV_FILTER_PLUGIN_EXPORT KivFilterPlugin* Create() {
    return new Duotone();
}

KIV_FILTER_PLUGIN_EXPORT void Destroy(KivFilterPlugin* plugin) {
    delete plugin;
}
