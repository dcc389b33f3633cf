#include "core/filters/sce/fullShaderEffects.h"

#include <GLES2/gl2.h>
#include <string.h>

#include <string>

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

android::sp<EglShader> KivEffectShader_build(const char* fragment, const char* const* uniforms,
                                             const char* source, int line, int* status) {
    android::sp<EglShader> shader = new EglShader();
    *status = 0;
    if (shader->initialize(false) != 0) {
        *status = VCError_report(VC_ERROR_ALLOC_FAILED, source, line);
    } else {
        unsigned int id = shader->loadShader(GL_FRAGMENT_SHADER, fragment);
        *status = id == 0 ? VCError_report(VC_ERROR_UNKNOWN, source, line)
                          : shader->bindFragmentShader(id, true);
    }
    if (*status != 0) {
        shader->release();
        return nullptr;
    }
    shader->bindProgram(EglShader::SHADER_PRECISION_HIGH);
    shader->addNameIndexer("a_position", EglShader::INDEX_ATTRIBUTE,
                           EglShader::INDEX_TYPE_POSITION);
    shader->addNameIndexer("a_texcoord", EglShader::INDEX_ATTRIBUTE,
                           EglShader::INDEX_TYPE_TEXCOORD);
    shader->addNameIndexer("texSampler", EglShader::INDEX_UNIFORM, EglShader::INDEX_TYPE_SAMPLER);
    for (int i = 0; uniforms != nullptr && uniforms[i] != nullptr; ++i) {
        shader->addNameIndexer(uniforms[i], EglShader::INDEX_UNIFORM, 0);
    }
    return shader;
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
    std::vector<const char*> names;
    for (const Uniform& u : mUniforms) names.push_back(u.name);
    names.push_back(nullptr);
    int status = 0;
    std::string windowed;
    mShader = KivEffectShader_build(program.windowedFragmentText(getFragmentShader(), &windowed),
                                    names.data(), source, line, &status);
    return status;
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
    if (texcoords == nullptr) texcoords = program.quadTexCoords();
    if (texcoords != nullptr) mShader->bindVertexAttrib("a_texcoord", 2, texcoords);
    program.setWindowUniform(mShader->getProgramId());
    glDrawArrays(GL_TRIANGLE_STRIP, 0, 4);
    // Logged, not returned: a failed draw must not make the program drop the effect.
    EglCheck_gl("glDrawArrays(GL_TRIANGLE_STRIP, 0, 4)", source, line);
    mShader->unBindVertexAttrib("a_position");
    mShader->unBindVertexAttrib("a_texcoord");
    return 0;
}
