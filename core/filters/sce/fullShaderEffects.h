// Base of the effects that own a complete fragment shader in their own
// EglShader and draw the quad themselves, instead of handing a snippet to the
// program. The program's draw flag is cleared while such an effect is loaded:
// the program sets the viewport and calls onDrawFrame, which binds the effect's
// program, sets its uniforms and draws.
//
// A member names its float uniforms once (pointing at its own members) and
// writes them under parameterLock(): option setters may run on a client
// thread while the render thread draws, and a frame must see either all old
// or all new values.
#ifndef KIV_CORE_FILTERS_SCE_FULLSHADEREFFECTS_H
#define KIV_CORE_FILTERS_SCE_FULLSHADEREFFECTS_H

#include <utils/RefBase.h>

#include <mutex>
#include <vector>

#include "core/KivFilter.h"
#include "core/egl/EglShader.h"

// A linked program of the quad's vertex shader and `fragment` (a complete
// shader), left current, with "a_position", "a_texcoord", "texSampler" and
// the null-terminated `uniforms` indexed. Null on failure, after logging the
// standard error line under `source`:`line` (-5 when no program can be made,
// -1 when the shader does not compile; a link failure is logged by the
// shader object), with the code in *status.
android::sp<EglShader> KivEffectShader_build(const char* fragment, const char* const* uniforms,
                                             const char* source, int line, int* status);

class FullShaderEffects : public KivFilter {
public:
    FullShaderEffects() = default;
    // Releases the shader object if releaseGL never took it; that needs the
    // GL context current, so owners hand it over through releaseGL first.
    ~FullShaderEffects() override;

    // No CPU path: these effects only exist as shaders.
    int doEffect() override { return VC_ERROR_UNSUPPORTED; }
    // Hands the shader object to the recycler and forgets it.
    int releaseGL(EglRecycler& recycler) override;

    // The complete fragment shader text.
    virtual const char* getFragmentShader() const = 0;

    // The current value of one of the effect's uniforms, copied into out (up
    // to 4 floats); its component count, or 0 for a name it does not have.
    int getUniform(const char* name, float out[4]) const;

    // Whether a shader object is held (between a successful load and releaseGL).
    bool hasShader() const { return mShader != nullptr; }

protected:
    // Called from constructors; values must outlive the effect (its members).
    void addUniform(const char* name, int components, float* values);
    std::mutex& parameterLock() const { return mParameterLock; }

    // The shared halves of loadPartialFragmentShader and onDrawFrame. Error
    // lines name `source` and `line`, the calling effect's own file and line.
    int loadFullShader(EglProgram& program, unsigned int& shaderId, const char* source, int line);
    // `texcoords` (4 vertices) null: the program's standard set for its camera
    // geometry type (none for a type above 3).
    int drawFullShader(EglProgram& program, const float* texcoords, const char* source, int line);

private:
    struct Uniform {
        const char* name;
        int components;
        float* values;
    };

    android::sp<EglShader> mShader;
    std::vector<Uniform> mUniforms;
    mutable std::mutex mParameterLock;
};

#endif
