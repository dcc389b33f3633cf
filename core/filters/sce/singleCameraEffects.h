// Base of the effects that are one fragment-shader pass over the camera
// texture. A member supplies only a GLSL function `vec4 doEffect()` (plus any
// declarations it needs); EglProgram wraps it in its one-input template
// (sampler `texSampler`, varying `v_texcoord`, and a main() that writes
// doEffect() to gl_FragColor), compiles it and draws the quad itself.
#ifndef KIV_CORE_FILTERS_SCE_SINGLECAMERAEFFECTS_H
#define KIV_CORE_FILTERS_SCE_SINGLECAMERAEFFECTS_H

#include "core/KivFilter.h"

class SingleCameraEffects : public KivFilter {
public:
    SingleCameraEffects() = default;

    int loadPartialFragmentShader(EglProgram& program, const char* header,
                                  unsigned int& shaderId) override;
    // The program draws the quad; nothing to add per frame.
    int onDrawFrame(EglProgram& program) override;
    int getFilterType() const override = 0;
    // No CPU path: these looks only exist as shaders.
    int doEffect() override { return VC_ERROR_UNSUPPORTED; }

    // The shader id of `code` inserted into the program's base fragment
    // template; 0 on failure.
    virtual unsigned int loadShader(EglProgram& program, const char* code);
    // The member's snippet; the pass-through one here.
    virtual const char* getFragmentShader() const;

    // The pass-through snippet (also NoEffect's).
    static const char kPassThroughShader[];
};

#endif
