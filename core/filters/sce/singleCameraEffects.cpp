#include "core/filters/sce/singleCameraEffects.h"

#include "core/egl/EglCheck.h"
#include "core/egl/EglProgram.h"
#include "vccore/vc_error.h"
#include "vccore/vc_log.h"

#define VC_SOURCE "core/filters/sce/singleCameraEffects"

const char SingleCameraEffects::kPassThroughShader[] =
    "vec4 doEffect() { return texture2D(texSampler, v_texcoord); }";

int SingleCameraEffects::loadPartialFragmentShader(EglProgram& program, const char* /*header*/,
                                                   unsigned int& shaderId) {
    // The program binds the quad and draws; this effect only supplies the code.
    program.setDrawFlag(true);
    shaderId = loadShader(program, getFragmentShader());
    if (shaderId == 0) {
        EglLog(VF_LOG_ERROR, "SingleEffect: could not load this shader");
        return VC_REPORT(VC_ERROR_UNKNOWN);
    }
    int result = program.bindFragmentShader(shaderId);
    if (result != 0) EglLog(VF_LOG_ERROR, "SingleEffect: failed to link this shader: %d", result);
    return result;
}

int SingleCameraEffects::onDrawFrame(EglProgram& /*program*/) {
    return 0;
}

unsigned int SingleCameraEffects::loadShader(EglProgram& program, const char* code) {
    return program.loadFragmentShader(code, false);
}

const char* SingleCameraEffects::getFragmentShader() const {
    return kPassThroughShader;
}
