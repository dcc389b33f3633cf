#include "core/filters/sce/fullShaderEffects.h"

#include <GLES2/gl2.h>
#include <string.h>

#include "core/egl/EglCheck.h"
#include "core/egl/EglProgram.h"
#include "core/egl/EglRecycler.h"
#include "vccore/vc_error.h"

FullShaderEffects::~FullShaderEffects() {
    if (mShader != nullptr) mShader->release();
}

int FullShaderEffects::releaseGL(EglRecycler& recycler) {
    recycler.putEglShader(mShader);
    mShader.clear();
    return 0;
}

void FullShaderEffects::addUniform(const char* name, int components, float* values) {
    mUniforms.push_back({name, components, values});
}

int FullShaderEffects::getUniform(const char* name, float out[4]) const {
    if (name == nullptr) return 0;
    std::lock_guard<std::mutex> lock(mParameterLock);
    for (const Uniform& u : mUniforms) {
        if (strcmp(u.name, name) != 0) continue;
        for (int i = 0; i < u.components && i < 4; ++i) out[i] = u.values[i];
        return u.components;
    }
    return 0;
}

int FullShaderEffects::loadFullShader(EglProgram& program, unsigned int& shaderId,
                                      const char* source, int line) {
    // The effect draws the quad itself.
    program.setDrawFlag(false);
    shaderId = 0;
    if (mShader != nullptr) {
        mShader->release();
        mShader.clear();
    }
    android::sp<EglShader> shader = new EglShader();
    if (shader->initialize(false) != 0) {
        shader->release();
        return VCError_report(VC_ERROR_ALLOC_FAILED, source, line);
    }
    unsigned int fragment = shader->loadShader(GL_FRAGMENT_SHADER, getFragmentShader());
    if (fragment == 0) {
        shader->release();
        return VCError_report(VC_ERROR_UNKNOWN, source, line);
    }
    int result = shader->bindFragmentShader(fragment, true);
    if (result != 0) {
        shader->release();
        return result;
    }
    shader->bindProgram(EglShader::SHADER_PRECISION_HIGH);
    shader->addNameIndexer("a_position", EglShader::INDEX_ATTRIBUTE,
                           EglShader::INDEX_TYPE_POSITION);
    shader->addNameIndexer("a_texcoord", EglShader::INDEX_ATTRIBUTE,
                           EglShader::INDEX_TYPE_TEXCOORD);
    shader->addNameIndexer("texSampler", EglShader::INDEX_UNIFORM, EglShader::INDEX_TYPE_SAMPLER);
    for (const Uniform& u : mUniforms) shader->addNameIndexer(u.name, EglShader::INDEX_UNIFORM, 0);
    mShader = shader;
    return 0;
}

int FullShaderEffects::drawFullShader(EglProgram& program, const float* texcoords,
                                      const char* source, int line) {
    if (mShader == nullptr) return 0;
    mShader->bindProgram(EglShader::SHADER_PRECISION_HIGH);
    mShader->setUniformi("texSampler", 0);
    {
        std::lock_guard<std::mutex> lock(mParameterLock);
        for (const Uniform& u : mUniforms) {
            if (u.components == 1) {
                mShader->setUniformf(u.name, u.values[0]);
            } else {
                mShader->setUniformfv(u.name, u.components, 1, u.values);
            }
        }
    }
    mShader->bindVertexAttrib("a_position", 3, EglProgram::kVertices);
    if (texcoords == nullptr) {
        int type = program.getCameraGeometryType(0);
        if (type >= EglProgram::GEOMETRY_VFLIP && type <= EglProgram::GEOMETRY_HFLIP) {
            texcoords = EglProgram::kTexCoords[type];
        }
    }
    if (texcoords != nullptr) mShader->bindVertexAttrib("a_texcoord", 2, texcoords);
    glDrawArrays(GL_TRIANGLE_STRIP, 0, 4);
    // Logged, not returned: a failed draw must not make the program drop the effect.
    EglCheck_gl("glDrawArrays(GL_TRIANGLE_STRIP, 0, 4)", source, line);
    mShader->unBindVertexAttrib("a_position");
    mShader->unBindVertexAttrib("a_texcoord");
    return 0;
}
