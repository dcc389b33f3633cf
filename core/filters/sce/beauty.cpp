#include "core/filters/sce/beauty.h"

#include <GLES2/gl2.h>
#include <stdio.h>
#include <string.h>

#include <algorithm>
#include <cmath>

#include "core/egl/EglCheck.h"
#include "core/egl/EglProgram.h"
#include "core/egl/EglRecycler.h"
#include "core/filters/sce/fullShaderEffects.h"
#include "vccore/vc_error.h"
#include "vccore/vc_log.h"

#define VC_SOURCE "core/filters/sce/beauty"

namespace {

// Per intensity 1 to 4 (0 uses the first row): ten weights, then ten tap
// distances in pixels of the quarter-size image (0 is the centre tap).
const float kBlurTable[4][2][Beauty::kTaps] = {
    {{0.249759f, 0.31948f, 0.053771f, 0, 0, 0, 0, 0, 0, 0},
     {0, 1.35724f, 3.20254f, 0, 0, 0, 0, 0, 0, 0}},
    {{0.124398f, 0.220962f, 0.137624f, 0.058678f, 0.01712f, 0, 0, 0, 0, 0},
     {0, 1.46368f, 3.4159f, 5.36966f, 7.32569f, 0, 0, 0, 0, 0}},
    {{0.082832f, 0.157076f, 0.126982f, 0.086591f, 0.049808f, 0.024166f, 0.00989f, 0.003414f, 0, 0},
     {0, 1.48388f, 3.46245f, 5.44115f, 7.42007f, 9.39927f, 11.3788f, 13.3588f, 0, 0}},
    {{0.062087f, 0.120502f, 0.106872f, 0.086106f, 0.063023f, 0.041905f, 0.025311f, 0.013889f,
      0.006923f, 0.003135f},
     {0, 1.49094f, 3.47888f, 5.46684f, 7.45484f, 9.44289f, 11.431f, 13.4192f, 15.4075f, 17.3959f}},
};

const char kCopyShader[] =
    "#extension GL_OES_EGL_image_external : require\n"
    "precision mediump float; uniform lowp samplerExternalOES texSampler; varying highp vec2 "
    "v_texcoord; void main() { gl_FragColor = vec4(texture2D(texSampler, v_texcoord).rgb, 1.0); "
    "}";

// The compose pass runs with the camera's texture coordinates mirrored
// vertically (see composeTable), so cameracoord is the camera position again:
// the camera colour and the face are read there, faces being given in the
// camera picture's own coordinates (y down). The blurred frame lies in the
// output's orientation; blurTransform maps cameracoord back onto it.
std::string composeShader() {
    return "#extension GL_OES_EGL_image_external : require\n"
           "#define NUM_FACES 3\n"
           "precision mediump float; uniform lowp samplerExternalOES texSampler; uniform lowp "
           "sampler2D blurSampler; uniform int faceCount; uniform highp vec3 "
           "skinToneMin[NUM_FACES]; uniform highp vec3 skinToneMax[NUM_FACES]; uniform highp "
           "vec4 facecoord[NUM_FACES]; uniform highp vec4 blurTransform; varying highp vec2 "
           "v_texcoord; void main() { highp vec2 cameracoord = vec2(v_texcoord.x, 1.0 - "
           "v_texcoord.y); vec3 color = texture2D(texSampler, cameracoord).rgb; vec3 blurColor = "
           "texture2D(blurSampler, cameracoord * blurTransform.xy + blurTransform.zw).rgb; highp "
           "vec2 c = (cameracoord - facecoord[0].xy) * facecoord[0].zw; highp float dist = "
           "length(c); bool skin = all(greaterThan(color, skinToneMin[0])) && "
           "all(lessThan(color, skinToneMax[0])); float outer = (dist < 1.0 && skin) ? 1.0 : 0.0; "
           "float inner = (dist < 0.7 && skin) ? 1.0 : 0.0; vec3 mid = mix(0.5 * (color + "
           "blurColor), blurColor, 0.9 * inner); mid = mix(color, 0.5 * blurColor + 0.5 * mid, "
           "0.3 * outer); mid = 0.7 * blurColor + 0.3 * mid; vec3 smoothed = mix(color, mid, 0.6 "
           "* outer); vec3 correct = (color * clamp(dist - 0.7, 0.0, 1.0) + smoothed * clamp(1.0 "
           "- dist, 0.0, 1.0)) / 0.3; vec3 result = dist < 0.7 ? smoothed : (dist > 1.0 ? color : "
           "correct); gl_FragColor = vec4(result, 1.0); }";
}

std::string blurShader(bool external) {
    std::string text = "#extension GL_OES_EGL_image_external : require\nprecision mediump float; ";
    text += external ? "uniform lowp samplerExternalOES texSampler; "
                     : "uniform lowp sampler2D texSampler; ";
    text +=
        "uniform highp vec2 offset[10]; uniform highp float weight[10]; uniform highp float "
        "weightSum; varying highp vec2 v_texcoord; void main() { vec2 cameracoord = v_texcoord; "
        "vec3 blur_color = texture2D(texSampler, cameracoord).rgb * weight[0];";
    for (int i = 1; i < Beauty::kTaps; ++i) {
        char line[200];
        snprintf(line, sizeof(line),
                 "blur_color += (texture2D(texSampler, cameracoord + offset[%d]).rgb + "
                 "texture2D(texSampler, cameracoord - offset[%d]).rgb)* weight[%d];",
                 i, i, i);
        text += line;
    }
    text += "gl_FragColor = vec4(blur_color, 1.0); }";
    return text;
}

const char* const kBlurUniforms[] = {"weight", "offset", nullptr};
const char* const kComposeUniforms[] = {"blurSampler", "faceCount", "skinToneMin",
                                        "skinToneMax", "facecoord", "blurTransform",
                                        nullptr};

// The camera coordinates of the copy and blur passes, and those of the
// compose pass: the same mirrored vertically (types 0<->1, 2<->3).
const float* cameraTable(int type) {
    return type >= 0 && type <= 3 ? EglProgram::kTexCoords[type] : nullptr;
}
const float* composeTable(int type) {
    static const int kMirror[4] = {1, 0, 3, 2};
    return type >= 0 && type <= 3 ? EglProgram::kTexCoords[kMirror[type]] : nullptr;
}
// blurcoord = cameracoord * xy + zw: the camera table's own mirroring (each
// of the four is its own inverse).
void blurTransform(int type, float out[4]) {
    static const float kTransforms[4][4] = {
        {1, -1, 0, 1}, {1, 1, 0, 0}, {-1, -1, 1, 1}, {-1, 1, 1, 0}};
    const float* t = kTransforms[type >= 0 && type <= 3 ? type : 1];
    std::copy(t, t + 4, out);
}

bool farApart(const float a[3], const float b[3]) {
    for (int k = 0; k < 3; ++k)
        if (!(std::fabs(a[k] - b[k]) > 0.1f)) return false;
    return true;
}

}  // namespace

const char Beauty::kEffectName[] = "Beauty";
const char* const Beauty::kParameterKeys[] = {"face",    "intensity", "width", "height",
                                              "left",    "top",       "right", "bottom",
                                              "tonemin", "tonemax",   nullptr};

KivFilterOptionTable& Beauty::optionTable() {
    static VCOption_t records[] = {KivOption_string("parameter")};
    static KivFilterOptionTable table(records);
    return table;
}

Beauty::Beauty()
    : mBlurShaders{blurShader(true), blurShader(false)}, mComposeShader(composeShader()) {
    mState = State();
    mState.intensity = 1;
    mState.faceCount = 0;
    for (int f = 0; f < kFaces; ++f) {
        for (int k = 0; k < 3; ++k) {
            mState.skinToneMin[f][k] = 0.0f;
            mState.skinToneMax[f][k] = 1.0f;
        }
    }
    computeBlurTable(mState);
}

Beauty::~Beauty() {
    for (auto& p : mPrograms) {
        if (p != nullptr) p->release();
    }
    releaseTargets();
}

const char* Beauty::getFragmentShader(BLUR_TYPE type) const {
    switch (type) {
        case BLUR_HORIZONTAL:
            return mBlurShaders[0].c_str();
        case BLUR_VERTICAL:
            return mBlurShaders[1].c_str();
        case BLUR_COMPOSE:
            return mComposeShader.c_str();
        default:
            return kCopyShader;
    }
}

const char* Beauty::getVertexShader() const {
    return EglShader::kVertexShader;
}

Beauty::State Beauty::getState() const {
    std::lock_guard<std::mutex> lock(mLock);
    return mState;
}

bool Beauty::hasPrograms() const {
    for (const auto& p : mPrograms)
        if (p == nullptr) return false;
    return true;
}

void Beauty::computeBlurTable(State& state) {
    const int row = std::max(state.intensity - 1, 0);
    for (int i = 0; i < kTaps; ++i) {
        const float distance = kBlurTable[row][1][i];
        state.weight[i] = kBlurTable[row][0][i];
        // No blur size before the first frame: the rebuild fills them in.
        state.offsetH[i][0] = state.blurWidth > 0 ? distance / state.blurWidth : 0.0f;
        state.offsetH[i][1] = 0.0f;
        state.offsetV[i][0] = 0.0f;
        state.offsetV[i][1] = state.blurHeight > 0 ? distance / state.blurHeight : 0.0f;
    }
}

int Beauty::setOption(const char* name, const char* value) {
    EglLog(VF_LOG_INFO, "EGL: Beauty::setOption = %s", value != nullptr ? value : "(null)");
    if (name == nullptr || strcmp(name, "parameter") != 0) return 1;
    KivParameterString_check(kEffectName, value, kParameterKeys);
    const int face = VCOption_ParseStringI(value, "face", 0);
    const int intensity = std::clamp(VCOption_ParseStringI(value, "intensity", 1), 0, 4);
    const int width = VCOption_ParseStringI(value, "width", -1);
    const int height = VCOption_ParseStringI(value, "height", -1);
    const int left = VCOption_ParseStringI(value, "left", -1);
    const int top = VCOption_ParseStringI(value, "top", -1);
    const int right = VCOption_ParseStringI(value, "right", -1);
    const int bottom = VCOption_ParseStringI(value, "bottom", -1);
    const int tonemin = VCOption_ParseStringI(value, "tonemin", 0);
    const int tonemax = VCOption_ParseStringI(value, "tonemax", 0);

    std::lock_guard<std::mutex> lock(mLock);
    if (intensity != mState.intensity) {
        mState.intensity = intensity;
        computeBlurTable(mState);
    }
    mState.faceCount = face;
    if (width == -1 || height == -1 || face < 1) return 1;
    // Each text describes the face with its number; three are kept.
    if (face > kFaces) {
        EglLog(VF_LOG_WARNING, "Beauty: face %d ignored: faces 1 to %d are kept", face, kFaces);
        return 1;
    }
    const float l = static_cast<float>(left) / std::max(width, 1);
    const float r = static_cast<float>(right) / std::max(width, 1);
    const float t = static_cast<float>(top) / std::max(height, 1);
    const float b = static_cast<float>(bottom) / std::max(height, 1);
    if (width <= 0 || height <= 0 || r == l || b == t) {
        EglLog(VF_LOG_WARNING,
               "Beauty: face %d ignored: its rectangle (%d,%d)-(%d,%d) in %dx%d has no area", face,
               left, top, right, bottom, width, height);
        return 1;
    }
    const int s = face - 1;
    // The ellipse's centre sits a little below the rectangle's (towards the chin).
    mState.facecoord[s][0] = 0.05f + (l + r) * 0.5f;
    mState.facecoord[s][1] = 0.07f + (t + b) * 0.5f;
    mState.facecoord[s][2] = 1.5f / (r - l);
    mState.facecoord[s][3] = 1.5f / (b - t);

    // A range spanning nearly everything is no skin range at all.
    const unsigned lo = static_cast<unsigned>(tonemin), hi = static_cast<unsigned>(tonemax);
    int span[3];
    for (int k = 0; k < 3; ++k) {
        const int shift = 16 - 8 * k;
        span[k] = static_cast<int>((hi >> shift) & 255u) - static_cast<int>((lo >> shift) & 255u);
    }
    if (span[0] > 180 && span[1] > 180 && span[2] >= 181) return 1;
    float newMin[3], newMax[3];
    for (int k = 0; k < 3; ++k) {
        const int shift = 16 - 8 * k;
        newMin[k] = ((lo >> shift) & 255u) / 255.0f;
        newMax[k] = ((hi >> shift) & 255u) / 255.0f;
    }
    // Small moves of a bound are detector noise: a bound changes only when
    // every channel moves by more than 0.1.
    if (farApart(newMin, mState.skinToneMin[s]))
        std::copy(newMin, newMin + 3, mState.skinToneMin[s]);
    if (farApart(newMax, mState.skinToneMax[s]))
        std::copy(newMax, newMax + 3, mState.skinToneMax[s]);
    return 1;
}

int Beauty::loadPartialFragmentShader(EglProgram& program, const char*, unsigned int& shaderId) {
    program.setDrawFlag(false);
    shaderId = 0;
    static const char* const* const kUniforms[4] = {nullptr, kBlurUniforms, kBlurUniforms,
                                                    kComposeUniforms};
    for (int type = 0; type < 4; ++type) {
        if (mPrograms[type] != nullptr) mPrograms[type]->release();
        mPrograms[type].clear();
    }
    for (int type = 0; type < 4; ++type) {
        int status = 0;
        mPrograms[type] = KivEffectShader_build(getFragmentShader(static_cast<BLUR_TYPE>(type)),
                                                kUniforms[type], VC_SOURCE, __LINE__, &status);
        if (status != 0) {
            for (auto& p : mPrograms) {
                if (p != nullptr) p->release();
                p.clear();
            }
            return status;
        }
    }
    return 0;
}

void Beauty::releaseTargets() {
    if (mBlurA != nullptr) mBlurA->release();
    if (mBlurB != nullptr) mBlurB->release();
    mBlurA.clear();
    mBlurB.clear();
}

int Beauty::releaseGL(EglRecycler& recycler) {
    for (auto& p : mPrograms) {
        recycler.putEglShader(p);
        p.clear();
    }
    recycler.putEglImage(mBlurA);
    recycler.putEglImage(mBlurB);
    mBlurA.clear();
    mBlurB.clear();
    return 0;
}

int Beauty::rebuildTargets(EglProgram& program, int blurWidth, int blurHeight) {
    releaseTargets();
    android::sp<EglImage> a = new EglImage(EglImage::IMAGE_FRAMEBUFFER, blurWidth, blurHeight);
    android::sp<EglImage> b = new EglImage(EglImage::IMAGE_FRAMEBUFFER, blurWidth, blurHeight);
    if (a->initialize() != 0 || b->initialize() != 0) {
        a->release();
        b->release();
        return VC_REPORT(VC_ERROR_ALLOC_FAILED);
    }
    mBlurA = a;
    mBlurB = b;
    mFlip = program.getPreviewFlip();
    std::lock_guard<std::mutex> lock(mLock);
    mState.blurWidth = blurWidth;
    mState.blurHeight = blurHeight;
    computeBlurTable(mState);
    return 0;
}

int Beauty::drawQuad(EglShader& shader, const float* texcoords) {
    shader.bindVertexAttrib("a_position", 3, EglProgram::kVertices);
    if (texcoords != nullptr) shader.bindVertexAttrib("a_texcoord", 2, texcoords);
    glDrawArrays(GL_TRIANGLE_STRIP, 0, 4);
    bool ok = EglCheck_gl("glDrawArrays(GL_TRIANGLE_STRIP, 0, 4)", VC_SOURCE, __LINE__);
    shader.unBindVertexAttrib("a_position");
    shader.unBindVertexAttrib("a_texcoord");
    return ok ? 0 : VC_ERROR_UNKNOWN;
}

int Beauty::onDrawFrame(EglProgram& program) {
    // Without its programs (their build failed, and was logged) the program's
    // own pass-through draws this frame.
    if (!hasPrograms()) return 0;
    const int type = program.getCameraGeometryType(0);
    const State state = getState();
    const int previewWidth = program.getPreviewWidth(), previewHeight = program.getPreviewHeight();
    const int blurWidth = previewWidth / 4, blurHeight = previewHeight / 4;
    bool smooth = state.faceCount > 0 && state.intensity > 0 && blurWidth > 0 && blurHeight > 0;
    if (smooth) {
        GLint previous = 0;
        GL_CHECK(glGetIntegerv(GL_FRAMEBUFFER_BINDING, &previous));
        // Rebuilt when the size or the flip changed: the offsets follow the size.
        if (!hasBlurTargets() || mFlip != program.getPreviewFlip() ||
            mBlurA->getWidth() != blurWidth || mBlurA->getHeight() != blurHeight) {
            if (rebuildTargets(program, blurWidth, blurHeight) != 0) {
                // No room for the blur: the frame goes through unchanged.
                EglLog(VF_LOG_ERROR, "Beauty: no %dx%d blur targets; drawing the frame as it is",
                       blurWidth, blurHeight);
                GL_CHECK(glBindFramebuffer(GL_FRAMEBUFFER, previous));
                smooth = false;
            }
        }
        if (smooth) {
            // One snapshot for the whole frame: a text set meanwhile shows on the
            // next frame whole, never half in the blur and half in the compose.
            State blur = state;
            blur.blurWidth = blurWidth;
            blur.blurHeight = blurHeight;
            computeBlurTable(blur);
            program.resetAvailableTextures();
            const int unit = program.getNextAvailableTexture();
            if (unit < 0) return unit;

            // Horizontal: camera (unit 0) into A, at the camera's orientation.
            mBlurA->bindFrameBuffer();
            GL_CHECK(glViewport(0, 0, blurWidth, blurHeight));
            GL_CHECK(glClearColor(0.0f, 0.0f, 0.0f, 1.0f));
            GL_CHECK(glClear(GL_COLOR_BUFFER_BIT));
            EglShader& h = *mPrograms[BLUR_HORIZONTAL];
            h.bindProgram(EglShader::SHADER_PRECISION_HIGH);
            h.setUniformi("texSampler", 0);
            h.setUniformfv("weight", 1, kTaps, blur.weight);
            h.setUniformfv("offset", 2, kTaps, &blur.offsetH[0][0]);
            drawQuad(h, cameraTable(type));

            // Vertical: A into B, plain coordinates.
            mBlurB->bindFrameBuffer();
            GL_CHECK(glClear(GL_COLOR_BUFFER_BIT));
            EglShader& v = *mPrograms[BLUR_VERTICAL];
            v.bindProgram(EglShader::SHADER_PRECISION_HIGH);
            GL_CHECK(glActiveTexture(GL_TEXTURE0 + unit));
            GL_CHECK(glBindTexture(GL_TEXTURE_2D, mBlurA->getTextureID()));
            v.setUniformi("texSampler", unit);
            v.setUniformfv("weight", 1, kTaps, blur.weight);
            v.setUniformfv("offset", 2, kTaps, &blur.offsetV[0][0]);
            drawQuad(v, EglProgram::kTexCoords[EglProgram::GEOMETRY_NORMAL]);

            // Compose into the frame's own target.
            GL_CHECK(glBindFramebuffer(GL_FRAMEBUFFER, previous));
            GL_CHECK(glViewport(0, 0, previewWidth, previewHeight));
            GL_CHECK(glClear(GL_COLOR_BUFFER_BIT));
            EglShader& c = *mPrograms[BLUR_COMPOSE];
            c.bindProgram(EglShader::SHADER_PRECISION_HIGH);
            GL_CHECK(glBindTexture(GL_TEXTURE_2D, mBlurB->getTextureID()));
            c.setUniformi("texSampler", 0);
            c.setUniformi("blurSampler", unit);
            c.setUniformi("faceCount", state.faceCount);
            c.setUniformfv("skinToneMin", 3, kFaces, &state.skinToneMin[0][0]);
            c.setUniformfv("skinToneMax", 3, kFaces, &state.skinToneMax[0][0]);
            c.setUniformfv("facecoord", 4, kFaces, &state.facecoord[0][0]);
            float transform[4];
            blurTransform(type, transform);
            c.setUniformfv("blurTransform", 4, 1, transform);
            drawQuad(c, composeTable(type));
            GL_CHECK(glBindTexture(GL_TEXTURE_2D, 0));
            GL_CHECK(glActiveTexture(GL_TEXTURE0));
            return 0;
        }
    }
    EglShader& copy = *mPrograms[BLUR_COPY];
    copy.bindProgram(EglShader::SHADER_PRECISION_HIGH);
    copy.setUniformi("texSampler", 0);
    drawQuad(copy, cameraTable(type));
    return 0;
}
