#include "core/egl/EglShader.h"

#include <GLES2/gl2.h>

#include <string>

#include "core/egl/EglCheck.h"
#include "core/egl/EglNativeSeam.h"
#include "vccore/vc_error.h"
#include "vccore/vc_log.h"

#define VC_SOURCE "core/egl/EglShader"

const char EglShader::kVertexShader[] =
    "attribute highp vec4 a_position; attribute highp vec2 a_texcoord; varying highp vec2 "
    "v_texcoord; void main() { gl_Position = a_position; v_texcoord = a_texcoord; }";

EglShader::EglShader() : mProgramId(0), mVertexId(0), mFragmentId(0) {}

EglShader::~EglShader() {}

int EglShader::initialize(bool link) {
    if (mProgramId != 0) release();

    if (!GL_CHECK(mProgramId = glCreateProgram()) || mProgramId == 0) {
        EglLog(VF_LOG_ERROR, "Could not create a new program");
        mProgramId = 0;
        return VC_REPORT(VC_ERROR_UNKNOWN);
    }

    unsigned int vertexId = loadShader(GL_VERTEX_SHADER, kVertexShader);
    if (vertexId == 0) {
        EglLog(VF_LOG_ERROR, "Failed to load vertex shader.");
        return VC_REPORT(VC_ERROR_ALLOC_FAILED);
    }
    // A program without a fragment shader cannot link; linking waits for one.
    return bindVertexShader(vertexId, link && mFragmentId != 0);
}

unsigned int EglShader::loadShader(unsigned int type, const char* text) const {
    unsigned int shaderType = type;
    GLuint shaderId = 0;
    if (!GL_CHECK(shaderId = glCreateShader(shaderType)) || shaderId == 0) {
        EglLog(VF_LOG_ERROR, "Failed to create a shader of type 0x%x (%s)", type,
               type == GL_FRAGMENT_SHADER ? "GL_FRAGMENT_SHADER" : "GL_VERTEX_SHADER");
        return 0;
    }
    // The library's text, as this GL is to compile it.
    std::string adapted;
    const char* source = EglNativeSeam::get().shaderText(shaderType, text, &adapted);
    GL_CHECK(glShaderSource(shaderId, 1, &source, NULL));
    GL_CHECK(glCompileShader(shaderId));
    GLint compiled = GL_FALSE;
    GL_CHECK(glGetShaderiv(shaderId, GL_COMPILE_STATUS, &compiled));
    if (compiled != GL_TRUE) {
        EglLog(VF_LOG_ERROR, "Failed to compile shader: %s", text);
        GL_CHECK(glDeleteShader(shaderId));
        return 0;
    }
    return shaderId;
}

int EglShader::bindVertexShader(unsigned int id, bool link) {
    if (mVertexId != 0 && mVertexId != id) unBindVertexShader();
    mVertexId = id;
    if (!GL_CHECK(glAttachShader(mProgramId, mVertexId))) return VC_REPORT(VC_ERROR_UNKNOWN);
    return link ? compileShader() : 0;
}

int EglShader::bindFragmentShader(unsigned int id, bool link) {
    if (mFragmentId != 0 && mFragmentId != id) unBindFragmentShader();
    mFragmentId = id;
    if (!GL_CHECK(glAttachShader(mProgramId, mFragmentId))) return VC_REPORT(VC_ERROR_UNKNOWN);
    return link ? compileShader() : 0;
}

int EglShader::compileShader() {
    GL_CHECK(glLinkProgram(mProgramId));
    GLint linkStatus = GL_FALSE;
    GL_CHECK(glGetProgramiv(mProgramId, GL_LINK_STATUS, &linkStatus));
    if (linkStatus != GL_TRUE) {
        EglLog(VF_LOG_ERROR, "GL Error: Program failed to link.");
        return VC_REPORT(VC_ERROR_UNKNOWN);
    }
    return 0;
}

void EglShader::unBindVertexShader() {
    if (mVertexId == 0) return;
    GL_CHECK(glDetachShader(mProgramId, mVertexId));
    GL_CHECK(glDeleteShader(mVertexId));
    mVertexId = 0;
}

void EglShader::unBindFragmentShader() {
    if (mFragmentId == 0) return;
    GL_CHECK(glDetachShader(mProgramId, mFragmentId));
    GL_CHECK(glDeleteShader(mFragmentId));
    mFragmentId = 0;
}

int EglShader::bindProgram(SHADER_PRECISION precision) {
    if (!GL_CHECK(glUseProgram((precision == SHADER_PRECISION_HIGH) ? mProgramId : mProgramId))) {
        return VC_REPORT(VC_ERROR_UNKNOWN);
    }
    return 0;
}

int EglShader::unbindProgram() {
    if (!GL_CHECK(glUseProgram(GL_NONE))) return VC_REPORT(VC_ERROR_UNKNOWN);
    return 0;
}

int EglShader::addNameIndexer(const char* name, int kind, int type) {
    if (mProgramId == 0 || name == nullptr) return 0;
    NameIndex& obj = mNameIndex[name];
    obj.mKind = kind;
    obj.mType = type;
    obj.mHandle = -1;
    if (kind == INDEX_ATTRIBUTE) {
        GL_CHECK(obj.mHandle = glGetAttribLocation(mProgramId, name));
    } else if (kind == INDEX_UNIFORM) {
        GL_CHECK(obj.mHandle = glGetUniformLocation(mProgramId, name));
    }
    return 1;
}

const EglShader::NameIndex* EglShader::getNameIndexer(const char* name) const {
    if (name == nullptr) return nullptr;
    auto it = mNameIndex.find(name);
    return it == mNameIndex.end() ? nullptr : &it->second;
}

void EglShader::clearIndexer() {
    mNameIndex.clear();
}

const EglShader::NameIndex* EglShader::findIndex(const char* name, int kind) const {
    const NameIndex* obj = getNameIndexer(name);
    if (obj == nullptr || obj->mKind != kind || obj->mHandle == -1) return nullptr;
    return obj;
}

void EglShader::setUniformi(const char* name, int value) {
    const NameIndex* obj = findIndex(name, INDEX_UNIFORM);
    if (obj == nullptr) return;
    GL_CHECK(glUniform1i(obj->mHandle, value));
}

void EglShader::setUniformf(const char* name, float value) {
    const NameIndex* obj = findIndex(name, INDEX_UNIFORM);
    if (obj == nullptr) return;
    GL_CHECK(glUniform1f(obj->mHandle, value));
}

void EglShader::setUniformfv(const char* name, int components, int size, const float* value) {
    const NameIndex* obj = findIndex(name, INDEX_UNIFORM);
    if (obj == nullptr) return;
    switch (components) {
        case 1:
            GL_CHECK(glUniform1fv(obj->mHandle, size, value));
            break;
        case 2:
            GL_CHECK(glUniform2fv(obj->mHandle, size, value));
            break;
        case 3:
            GL_CHECK(glUniform3fv(obj->mHandle, size, value));
            break;
        case 4:
            GL_CHECK(glUniform4fv(obj->mHandle, size, value));
            break;
        default:
            EglLog(VF_LOG_ERROR, "EglShader: %d-component uniform '%s' is not supported",
                   components, name);
            break;
    }
}

void EglShader::bindVertexAttrib(const char* name, int component, const void* value) {
    const NameIndex* obj = findIndex(name, INDEX_ATTRIBUTE);
    if (obj == nullptr) return;
    GL_CHECK(glVertexAttribPointer(obj->mHandle, component, GL_FLOAT, GL_FALSE, 0, value));
    GL_CHECK(glEnableVertexAttribArray(obj->mHandle));
}

void EglShader::unBindVertexAttrib(const char* name) {
    const NameIndex* obj = findIndex(name, INDEX_ATTRIBUTE);
    if (obj == nullptr) return;
    GL_CHECK(glDisableVertexAttribArray(obj->mHandle));
}

void EglShader::release() {
    if (mProgramId != 0) {
        // A deleted program that is still in use lives on until another one
        // is; let go of it so that release really frees it.
        GLint current = 0;
        GL_CHECK(glGetIntegerv(GL_CURRENT_PROGRAM, &current));
        if (static_cast<GLuint>(current) == mProgramId) GL_CHECK(glUseProgram(GL_NONE));
        GLsizei iAttachCnt = 16;
        GLuint iShaders[16] = {};
        if (!GL_CHECK(glGetAttachedShaders(mProgramId, iAttachCnt, &iAttachCnt, iShaders))) {
            iAttachCnt = 0;
        }
        for (GLsizei i = 0; i < iAttachCnt; i++) {
            GL_CHECK(glDetachShader(mProgramId, iShaders[i]));
            // Our own two are deleted below; anything else attached goes now.
            if (iShaders[i] != mVertexId && iShaders[i] != mFragmentId) {
                GL_CHECK(glDeleteShader(iShaders[i]));
            }
        }
    }
    if (mVertexId != 0) GL_CHECK(glDeleteShader(mVertexId));
    if (mFragmentId != 0) GL_CHECK(glDeleteShader(mFragmentId));
    if (mProgramId != 0) GL_CHECK(glDeleteProgram(mProgramId));
    mVertexId = 0;
    mFragmentId = 0;
    mProgramId = 0;
    clearIndexer();
}

void EglShader::dumpShaderCode(const char* code) const {
    EglLog(VF_LOG_DEBUG, "[shader] %s", code ? code : "");
}
