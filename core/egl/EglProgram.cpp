#include "core/egl/EglProgram.h"

#include <GLES2/gl2.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include "core/KivFilter.h"
#include "core/egl/EglCheck.h"
#include "vccore/vc_error.h"
#include "vccore/vc_log.h"

#define VC_SOURCE "core/egl/EglProgram"

using android::Mutex;
using android::sp;

namespace {
// Downloadable effects have ids from here on; they supply complete shaders.
const int kFirstExternalFilterType = 2000;
}  // namespace

const float EglProgram::kVertices[12] = {
    -1.0f, -1.0f, 0.0f,  //
    1.0f,  -1.0f, 0.0f,  //
    -1.0f, 1.0f,  0.0f,  //
    1.0f,  1.0f,  0.0f,
};

const float EglProgram::kTexCoords[4][8] = {
    {0.0f, 1.0f, 1.0f, 1.0f, 0.0f, 0.0f, 1.0f, 0.0f},  // GEOMETRY_VFLIP
    {0.0f, 0.0f, 1.0f, 0.0f, 0.0f, 1.0f, 1.0f, 1.0f},  // GEOMETRY_NORMAL
    {1.0f, 1.0f, 0.0f, 1.0f, 1.0f, 0.0f, 0.0f, 0.0f},  // GEOMETRY_ROTATE_180
    {1.0f, 0.0f, 0.0f, 0.0f, 1.0f, 1.0f, 0.0f, 1.0f},  // GEOMETRY_HFLIP
};

const char EglProgram::kBaseFragmentCode[] =
    "#extension GL_OES_EGL_image_external : require\nprecision mediump float; uniform lowp "
    "samplerExternalOES texSampler; varying highp vec2 v_texcoord; %s void main() { "
    "gl_FragColor = doEffect(); }";

const char EglProgram::kBaseFragmentCode2[] =
    "#extension GL_OES_EGL_image_external : require\nprecision mediump float; uniform lowp "
    "samplerExternalOES texSampler; uniform lowp samplerExternalOES texSampler2; varying highp "
    "vec2 v_texcoord; %s void main() { gl_FragColor = doEffect2(); }";

const char EglProgram::kDefaultFragmentShader[] =
    "#extension GL_OES_EGL_image_external : require\nprecision mediump float; uniform lowp "
    "samplerExternalOES texSampler; varying highp vec2 v_texcoord; void main() { "
    "gl_FragColor.rgb = texture2D(texSampler, v_texcoord).rgb; gl_FragColor.a = 1.0; }";

const char EglProgram::kDefaultFragmentShader2D[] =
    "precision mediump float; uniform lowp sampler2D texSampler; varying highp vec2 v_texcoord; "
    "void main() { gl_FragColor.rgb = texture2D(texSampler, v_texcoord).rgb; gl_FragColor.a = "
    "1.0; }";

EglProgram::EglProgram()
    : mRecycler(new EglRecycler()),
      mShader(new EglShader()),
      mNextTexture(1),
      mMaxAvailableTextures(0),
      mFilter(nullptr),
      mCameraMode(10),
      mCameraWidth(0),
      mCameraHeight(0),
      mCameraWidth2(0),
      mCameraHeight2(0),
      mCamera0GeometryType(GEOMETRY_VFLIP),
      mCamera1GeometryType(GEOMETRY_ROTATE_180),
      mPreviewWidth(0),
      mPreviewHeight(0),
      mDefaultOnly(false),
      mPreviewFlip(true),
      mReloadNeeded(false),
      mNameIndexReady(false),
      mDrawFlag(true) {}

EglProgram::~EglProgram() {}

int EglProgram::initialize(int cameraMode, bool defaultOnly) {
    Mutex::Autolock lock(mLock);
    return initialize_l(cameraMode, defaultOnly);
}

void EglProgram::release() {
    Mutex::Autolock lock(mLock);
    release_l();
}

int EglProgram::initialize_l(int cameraMode, bool defaultOnly) {
    EGL_GL_CLEAR_ERRORS();

    GL_CHECK(glGetIntegerv(GL_MAX_COMBINED_TEXTURE_IMAGE_UNITS, &mMaxAvailableTextures));
    EglLog(VF_LOG_DEBUG, "EGL: OpenGL supports up to %d image units (GL_TEXTURE0 to GL_TEXTURE%d)",
           mMaxAvailableTextures, mMaxAvailableTextures - 1);
    resetAvailableTextures();

    mDefaultOnly = defaultOnly;
    if (defaultOnly) {
        mCameraMode = 10;
        mPreviewFlip = false;
        mFilter = nullptr;
    } else {
        mCameraMode = cameraMode;
    }

    // A failed effect draw releases the shader object; make a fresh one.
    if (mShader == nullptr) mShader = new EglShader();
    if (mShader->initialize(true) != 0) return VC_REPORT(VC_ERROR_ALLOC_FAILED);

    mNameIndexReady = false;
    mReloadNeeded = true;
    return loadEffectShader();
}

void EglProgram::release_l() {
    if (mShader != nullptr) {
        mShader->release();
        mShader.clear();
    }
    mNameIndexReady = false;
}

void EglProgram::setFilter(KivFilter* filter) {
    Mutex::Autolock lock(mLock);
    if (mDefaultOnly) return;
    mReloadNeeded = true;
    if (mFilter != nullptr) mFilter->releaseGL(*mRecycler);
    mFilter = filter;
}

int EglProgram::setCameraGeometry(int width, int height, int third, int fourth) {
    if (width <= 0 || height <= 0) return VC_REPORT(VC_ERROR_INVALID_PARAM);
    Mutex::Autolock lock(mLock);
    mCameraWidth = width;
    mCameraHeight = height;
    mCameraWidth2 = third > 0 ? third : width;
    // Falls back to the width, not the height: effects expect it that way.
    mCameraHeight2 = fourth > 0 ? fourth : width;
    return 0;
}

int EglProgram::setPreviewGeometry(int width, int height, bool flip) {
    if (width <= 0 || height <= 0) return VC_REPORT(VC_ERROR_INVALID_PARAM);
    Mutex::Autolock lock(mLock);
    mPreviewWidth = width;
    mPreviewHeight = height;
    mPreviewFlip = flip;
    return 0;
}

void EglProgram::setCameraGeometryType(GeometryType type, int camera) {
    Mutex::Autolock lock(mLock);
    if (camera == 0) {
        mCamera0GeometryType = type;
    } else {
        mCamera1GeometryType = type;
    }
}

EglProgram::GeometryType EglProgram::getCameraGeometryType(int camera) const {
    return camera == 0 ? mCamera0GeometryType : mCamera1GeometryType;
}

const char* EglProgram::getBaseFragmentCode() const {
    return isDualCamera() ? kBaseFragmentCode2 : kBaseFragmentCode;
}

unsigned int EglProgram::loadFragmentShader(const char* code, bool complete) {
    if (code == nullptr) return 0;
    if (mShader == nullptr) {
        VC_REPORT(VC_ERROR_UNKNOWN);
        return 0;
    }
    std::string windowed;
    if (complete)
        return mShader->loadShader(GL_FRAGMENT_SHADER, windowedFragmentText(code, &windowed));

    char* source = nullptr;
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
    int length = asprintf(&source, getBaseFragmentCode(), code);
#pragma GCC diagnostic pop
    if (length < 0 || source == nullptr) {
        VC_REPORT(VC_ERROR_ALLOC_FAILED);
        return 0;
    }
    unsigned int id =
        mShader->loadShader(GL_FRAGMENT_SHADER, windowedFragmentText(source, &windowed));
    free(source);
    return id;
}

int EglProgram::bindFragmentShader(unsigned int id) {
    if (mShader == nullptr) return VC_REPORT(VC_ERROR_UNKNOWN);
    return mShader->bindFragmentShader(id, true);
}

void EglProgram::resetAvailableTextures() {
    mNextTexture = 1;
}

int EglProgram::getNextAvailableTexture() {
    if (mNextTexture >= mMaxAvailableTextures) {
        EglLog(VF_LOG_ERROR,
               "EGL Error: Running out of available textures! Please check the filter code!");
        return VC_REPORT(VC_ERROR_ALLOC_FAILED);
    }
    return ++mNextTexture;
}

unsigned int EglProgram::getProgramID() const {
    return mShader == nullptr ? 0 : mShader->getProgramId();
}

int EglProgram::loadEffectShader() {
    VFTraceSection trace("EglProgram::loadEffectShader()");
    if (!mReloadNeeded) return 0;

    mShader->unBindFragmentShader();

    bool loaded = false;
    if (!mDefaultOnly && mFilter != nullptr) {
        int filterType = mFilter->getFilterType();
        EglLog(VF_LOG_DEBUG,
               "Loading effect fragment shader... mCameraMode = %d, getfilterType = %d",
               mCameraMode, filterType);
        unsigned int shaderId = 0;
        int result = -1;
        if (filterType < kFirstExternalFilterType) {
            result = mFilter->loadPartialFragmentShader(*this, getBaseFragmentCode(), shaderId);
        } else {
            mDrawFlag = true;
            int id = mFilter->loadExtFragmentShader(*this);
            // Not a shader name: 0, or a negative status from an effect
            // without an external shader.
            if (id <= 0) {
                result = VC_REPORT(VC_ERROR_UNKNOWN);
            } else {
                shaderId = static_cast<unsigned int>(id);
                result = bindFragmentShader(shaderId);
            }
        }
        if (result == 0) {
            EglLog(VF_LOG_DEBUG, "Created and linked shader as #%d", shaderId);
            loaded = true;
        }
    }

    if (!loaded) {
        if (!mDefaultOnly && mFilter != nullptr) {
            EGL_GL_CLEAR_ERRORS();
            EglLog(VF_LOG_ERROR, "GL Error: failed to load effect shader. Loading default.");
        }
        int result = loadDefaultShader();
        if (result != 0) return result;
    }

    mReloadNeeded = false;
    if (mDrawFlag) {
        int result = initShaderIndexer();
        if (result != 0) {
            EglLog(VF_LOG_ERROR, "initShaderIndexer failed: programId = %d", getProgramID());
            return result;
        }
    }
    EglLog(VF_LOG_DEBUG, "Successfully linked the GL program: #%d", getProgramID());
    return 0;
}

int EglProgram::loadDefaultShader() {
    EglLog(VF_LOG_DEBUG, "Loading default fragment shader.");
    // The pass-through draws by itself, whatever a failed effect left behind.
    mDrawFlag = true;
    // A failed effect may have left its own fragment shader attached.
    mShader->unBindFragmentShader();
    unsigned int id =
        loadFragmentShader(mDefaultOnly ? kDefaultFragmentShader2D : kDefaultFragmentShader, true);
    if (id == 0) {
        EglLog(VF_LOG_ERROR, "Failed to load default fragment shader!!!");
        return VC_REPORT(VC_ERROR_UNKNOWN);
    }
    EglLog(VF_LOG_DEBUG, "Created and linked default shader as #%d", id);
    int result = mShader->bindFragmentShader(id, true);
    if (result != 0) {
        EglLog(VF_LOG_ERROR,
               "Could not link the default GL program. This is really bad. Screen will go black!");
        mShader->release();
        return result;
    }
    return 0;
}

int EglProgram::initShaderIndexer() {
    if (mShader == nullptr) return VC_REPORT(VC_ERROR_UNKNOWN);
    int result = mShader->bindProgram(EglShader::SHADER_PRECISION_HIGH);
    if (result != 0) return result;
    mShader->addNameIndexer("a_position", EglShader::INDEX_ATTRIBUTE,
                            EglShader::INDEX_TYPE_POSITION);
    mShader->addNameIndexer("a_texcoord", EglShader::INDEX_ATTRIBUTE,
                            EglShader::INDEX_TYPE_TEXCOORD);
    mShader->addNameIndexer("texSampler", EglShader::INDEX_UNIFORM, EglShader::INDEX_TYPE_SAMPLER);
    mShader->setUniformi("texSampler", 0);
    if (isDualCamera()) {
        mShader->addNameIndexer("texSampler2", EglShader::INDEX_UNIFORM,
                                EglShader::INDEX_TYPE_SAMPLER);
        mShader->setUniformi("texSampler2", 1);
    }
    mNameIndexReady = true;
    return 0;
}

namespace {
// Every read through texture2D goes to the part of the picture the texture
// holds; the effect's own text stays as it is.
const char kWindowPrelude[] =
    "uniform highp vec4 kivWindowMap; uniform highp vec2 kivWindowScale;\n"
    "#define texture2D(s, c) texture2D(s, ((c) * kivWindowMap.xy - kivWindowMap.zw) * "
    "kivWindowScale)\n";
}  // namespace

void EglProgram::setWindow(const Window* window) {
    Mutex::Autolock lock(mLock);
    if ((window != nullptr) != mWindowOn) mReloadNeeded = true;
    mWindowOn = window != nullptr;
    if (window != nullptr) mWindow = *window;
}

const char* EglProgram::windowedFragmentText(const char* text, std::string* storage) const {
    if (!mWindowOn || text == nullptr) return text;
    // After the directives that must come first.
    const char* at = text;
    while (strncmp(at, "#version", 8) == 0 || strncmp(at, "#extension", 10) == 0) {
        const char* end = strchr(at, '\n');
        if (end == nullptr) break;
        at = end + 1;
    }
    storage->assign(text, at);
    storage->append(kWindowPrelude);
    storage->append(at);
    return storage->c_str();
}

void EglProgram::setWindowUniform(unsigned int programId) const {
    if (!mWindowOn) return;
    GLint map = -1, scale = -1;
    GL_CHECK(map = glGetUniformLocation(programId, "kivWindowMap"));
    GL_CHECK(scale = glGetUniformLocation(programId, "kivWindowScale"));
    // A shader that reads no texture has no mapping to set.
    if (map >= 0) GL_CHECK(glUniform4fv(map, 1, mWindow.sampleMap));
    if (scale >= 0) GL_CHECK(glUniform2fv(scale, 1, mWindow.sampleScale));
}

void EglProgram::viewport_l() {
    if (mWindowOn) {
        GL_CHECK(glViewport(0, 0, mWindow.width, mWindow.height));
    } else {
        GL_CHECK(glViewport(0, 0, mPreviewWidth, mPreviewHeight));
    }
}

const float* EglProgram::quadTexCoords() const {
    if (mWindowOn) return mWindow.texCoords;
    if (mCamera0GeometryType >= GEOMETRY_VFLIP && mCamera0GeometryType <= GEOMETRY_HFLIP)
        return kTexCoords[mCamera0GeometryType];
    return nullptr;
}

void EglProgram::bindQuad_l() {
    mShader->bindProgram(EglShader::SHADER_PRECISION_HIGH);
    if (!mNameIndexReady) initShaderIndexer();
    mShader->bindVertexAttrib("a_position", 3, kVertices);
    const float* texcoord = nullptr;
    if (isDualCamera()) {
        texcoord = kTexCoords[mPreviewFlip ? GEOMETRY_VFLIP : GEOMETRY_NORMAL];
    } else {
        texcoord = quadTexCoords();
    }
    if (texcoord != nullptr) mShader->bindVertexAttrib("a_texcoord", 2, texcoord);
    setWindowUniform(getProgramID());
}

int EglProgram::redrawFrame() {
    Mutex::Autolock lock(mLock);
    if (mShader == nullptr || !mDrawFlag || mReloadNeeded) return VC_REPORT(VC_ERROR_INVALID_STATE);
    viewport_l();
    bindQuad_l();
    if (!GL_CHECK(glDrawArrays(GL_TRIANGLE_STRIP, 0, 4))) return VC_REPORT(VC_ERROR_UNKNOWN);
    mShader->unBindVertexAttrib("a_position");
    mShader->unBindVertexAttrib("a_texcoord");
    GL_CHECK(glFlush());
    return 0;
}

int EglProgram::onDrawFrame() {
    Mutex::Autolock lock(mLock);

    // Deleting a recycled image unbinds the framebuffer; the frame still goes
    // where the caller bound it.
    GLint target = 0;
    const bool images = mRecycler->pendingEglImages() > 0;
    if (images) GL_CHECK(glGetIntegerv(GL_FRAMEBUFFER_BINDING, &target));
    mRecycler->recycle();
    if (images && target != 0 && glIsFramebuffer(target)) {
        GL_CHECK(glBindFramebuffer(GL_FRAMEBUFFER, target));
    }
    // Released (or never initialised): nothing to draw with.
    if (mShader == nullptr) return VC_REPORT(VC_ERROR_INVALID_STATE);

    if (mReloadNeeded) {
        EglLog(VF_LOG_DEBUG, "Switching to new Effect Filter...");
        mNameIndexReady = false;
        int result = loadEffectShader();
        mReloadNeeded = false;
        if (result != 0) return result;
    }

    viewport_l();

    if (mDrawFlag) bindQuad_l();

    if (mFilter != nullptr) {
        int result = mFilter->onDrawFrame(*this);
        if (result != 0) {
            EglLog(VF_LOG_ERROR, "The filter returned %d from onDrawFrame!", result);
            // Dropped, not deleted: the effect belongs to the caller.
            mFilter = nullptr;
            release_l();
            initialize_l(mCameraMode, false);
            return result;
        }
    }

    if (mDrawFlag) {
        if (!GL_CHECK(glDrawArrays(GL_TRIANGLE_STRIP, 0, 4))) return VC_REPORT(VC_ERROR_UNKNOWN);
        mShader->unBindVertexAttrib("a_position");
        mShader->unBindVertexAttrib("a_texcoord");
    }

    GL_CHECK(glFlush());
    return 0;
}
