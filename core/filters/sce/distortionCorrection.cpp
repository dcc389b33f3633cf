#include <math.h>

#include <algorithm>
#include <cmath>

#include "core/egl/EglCheck.h"
#include "core/egl/EglProgram.h"
#include "core/filters/sce/geometricEffects.h"
#include "vccore/vc_log.h"

#define VC_SOURCE "core/filters/sce/distortionCorrection"

namespace {

// How far the level moves per drawn frame, and the zoom per side at level 1.
constexpr float kLevelStep = 0.075f;
constexpr double kPi = 3.141592653589793;

void setQuad(float* set, float x0, float y0, float x1, float y1, float x2, float y2, float x3,
             float y3) {
    const float values[8] = {x0, y0, x1, y1, x2, y2, x3, y3};
    std::copy(values, values + 8, set);
}

}  // namespace

const char DistortionCorrection::kEffectName[] = "DistortionCorrection";
const char* const DistortionCorrection::kParameterKeys[] = {"FA", "LE", "TO", "RI", "BO", nullptr};

float DistortionCorrection::DISTORTION_TEXCOORD[8] = {0, 1, 1, 1, 0, 0, 1, 0};
float DistortionCorrection::DISTORTION_TEXCOORD_V_FLIP[8] = {0, 0, 1, 0, 0, 1, 1, 1};
float DistortionCorrection::DISTORTION_TEXCOORD_H_FLIP[8] = {1, 1, 0, 1, 1, 0, 0, 0};
float DistortionCorrection::DISTORTION_TEXCOORD_HV_FLIP[8] = {1, 0, 0, 0, 1, 1, 0, 1};

DistortionCorrection::DistortionCorrection() {
    addUniform("u_distortion", 1, &mDistortion);
    addUniform("u_ratio", 1, &mRatio);
}

const char* DistortionCorrection::getFragmentShader() const {
    return "#extension GL_OES_EGL_image_external : require\n"
           "precision mediump float; uniform lowp samplerExternalOES texSampler; uniform highp "
           "float u_distortion; uniform float u_ratio; varying highp vec2 v_texcoord; const "
           "highp vec2 center = vec2(0.5, 0.5); void main() { highp vec2 texcoord = v_texcoord; "
           "if (u_distortion != 0.0) { float width = (v_texcoord.x - center.x) * u_ratio; float "
           "height = (v_texcoord.y - center.y); float dist = sqrt(width * width + height * "
           "height); highp float radius = dist * u_distortion; float theta = atan(radius) / "
           "radius; texcoord = center + (2.0 - theta) * (texcoord - center); } lowp vec4 "
           "new_color = texture2D(texSampler, texcoord); gl_FragColor = vec4(new_color.rgb, "
           "1.0); }";
}

int DistortionCorrection::loadPartialFragmentShader(EglProgram& program, const char*,
                                                    unsigned int& shaderId) {
    return loadFullShader(program, shaderId, VC_SOURCE, __LINE__);
}

// "FA" switches the correction: absent leaves everything as it is, below 1
// turns it off, otherwise the rectangle's centre sets the level.
void DistortionCorrection::applyParameter(const char* text) {
    int fa = VCOption_ParseStringI(text, "FA", -1);
    if (fa == -1) return;
    double level = 0.0;
    if (fa >= 1) {
        double le = VCOption_ParseStringI(text, "LE", 0), to = VCOption_ParseStringI(text, "TO", 0);
        double ri = VCOption_ParseStringI(text, "RI", 0), bo = VCOption_ParseStringI(text, "BO", 0);
        // The rectangle's centre as a fraction of the 2000-unit frame.
        double y = (bo + to) * 0.5 / 2000.0, x = (le + ri) * 0.5 / 2000.0;
        double d = std::sqrt(x * x + y * y);
        double a = std::fabs(std::trunc(std::atan2(-x, -y) * 180.0 / kPi));
        // Towards the top and bottom edges the correction is weaker.
        double k =
            (a < 30.0 || a > 150.0) ? std::min(0.6 + 0.8 * std::sin(a * kPi / 180.0), 1.0) : 1.0;
        level = k * std::clamp(-0.1 + 3.0 * d, 0.0, 1.0);
    }
    {
        std::lock_guard<std::mutex> lock(parameterLock());
        mDistortionLevel = static_cast<float>(level);
    }
    EglLog(VF_LOG_DEBUG, "mDistortionLevel = %f", level);
}

float DistortionCorrection::getTargetLevel() const {
    std::lock_guard<std::mutex> lock(parameterLock());
    return mDistortionLevel;
}

int DistortionCorrection::onDrawFrame(EglProgram& program) {
    float target = getTargetLevel();
    if (mCurrentLevel != target) {
        float stepped = mCurrentLevel + (target > mCurrentLevel ? kLevelStep : -kLevelStep);
        if (std::fabs(target - stepped) <= kLevelStep) stepped = target;
        mCurrentLevel = std::clamp(stepped, 0.0f, 1.0f);
    }
    const float c = mCurrentLevel, lo = kLevelStep * c, hi = 1.0f - kLevelStep * c;
    setQuad(DISTORTION_TEXCOORD, lo, hi, hi, hi, lo, lo, hi, lo);
    setQuad(DISTORTION_TEXCOORD_H_FLIP, hi, hi, lo, hi, hi, lo, lo, lo);
    setQuad(DISTORTION_TEXCOORD_V_FLIP, lo, lo, hi, lo, lo, hi, hi, hi);
    setQuad(DISTORTION_TEXCOORD_HV_FLIP, hi, lo, lo, lo, hi, hi, lo, hi);

    float ratio = program.getPreviewHeight() > 0
                      ? static_cast<float>(program.getPreviewWidth()) / program.getPreviewHeight()
                      : 1.0f;
    {
        std::lock_guard<std::mutex> lock(parameterLock());
        mRatio = ratio;
        // Frames narrower than about 16:9 need a stronger correction.
        mDistortion = ratio > 1.7f ? c : c * 1.2238373f;
    }
    const float* texcoords = nullptr;
    switch (program.getCameraGeometryType(0)) {
        case EglProgram::GEOMETRY_VFLIP:
            texcoords = DISTORTION_TEXCOORD;
            break;
        case EglProgram::GEOMETRY_NORMAL:
            texcoords = DISTORTION_TEXCOORD_V_FLIP;
            break;
        case EglProgram::GEOMETRY_ROTATE_180:
            texcoords = DISTORTION_TEXCOORD_H_FLIP;
            break;
        case EglProgram::GEOMETRY_HFLIP:
            texcoords = DISTORTION_TEXCOORD_HV_FLIP;
            break;
    }
    return drawFullShader(program, texcoords, VC_SOURCE, __LINE__);
}
