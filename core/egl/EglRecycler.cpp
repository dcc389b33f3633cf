#include "core/egl/EglRecycler.h"

#include <GLES2/gl2.h>

#include "core/egl/EglCheck.h"
#include "core/egl/EglImage.h"
#include "core/egl/EglShader.h"

#define VC_SOURCE "core/egl/EglRecycler"

using android::Mutex;
using android::sp;

EglRecycler::EglRecycler() {}

EglRecycler::~EglRecycler() {
    recycle();
}

void EglRecycler::putTexture(unsigned int texture) {
    if (texture == 0) return;
    Mutex::Autolock lock(mLock);
    if (mTextureList.indexOf(texture) < 0) mTextureList.add(texture);
}

void EglRecycler::putProgram(unsigned int program) {
    if (program == 0) return;
    Mutex::Autolock lock(mLock);
    if (mGLProgramList.indexOf(program) < 0) mGLProgramList.add(program);
}

void EglRecycler::putEglImage(const sp<EglImage>& image) {
    if (image == nullptr) return;
    Mutex::Autolock lock(mLock);
    if (mEglImageList.indexOf(image) < 0) mEglImageList.add(image);
}

void EglRecycler::putEglShader(const sp<EglShader>& shader) {
    if (shader == nullptr) return;
    Mutex::Autolock lock(mLock);
    if (mEglShaderList.indexOf(shader) < 0) mEglShaderList.add(shader);
}

void EglRecycler::recycle() {
    deleteTextures();
    deletePrograms();
    deleteEglImages();
    deleteEglShaders();
}

void EglRecycler::deleteTextures() {
    Mutex::Autolock lock(mLock);
    if (mTextureList.isEmpty()) return;
    GL_CHECK(glDeleteTextures(static_cast<GLsizei>(mTextureList.size()), mTextureList.array()));
    mTextureList.clear();
}

void EglRecycler::deletePrograms() {
    Mutex::Autolock lock(mLock);
    for (size_t ct = 0; ct < mGLProgramList.size(); ct++) {
        GLsizei iAttachCnt = 16;
        GLuint iShaders[16] = {};
        if (!GL_CHECK(
                glGetAttachedShaders(mGLProgramList[ct], iAttachCnt, &iAttachCnt, iShaders))) {
            iAttachCnt = 0;
        }
        for (GLsizei i = 0; i < iAttachCnt; i++) {
            GL_CHECK(glDetachShader(mGLProgramList[ct], iShaders[i]));
        }
        GL_CHECK(glDeleteProgram(mGLProgramList[ct]));
    }
    mGLProgramList.clear();
}

void EglRecycler::deleteEglImages() {
    Mutex::Autolock lock(mLock);
    for (size_t i = 0; i < mEglImageList.size(); i++) {
        mEglImageList[i]->release();
    }
    mEglImageList.clear();
}

void EglRecycler::deleteEglShaders() {
    Mutex::Autolock lock(mLock);
    for (size_t i = 0; i < mEglShaderList.size(); i++) {
        mEglShaderList[i]->release();
    }
    mEglShaderList.clear();
}

size_t EglRecycler::pendingTextures() const {
    Mutex::Autolock lock(mLock);
    return mTextureList.size();
}

size_t EglRecycler::pendingPrograms() const {
    Mutex::Autolock lock(mLock);
    return mGLProgramList.size();
}

size_t EglRecycler::pendingEglImages() const {
    Mutex::Autolock lock(mLock);
    return mEglImageList.size();
}

size_t EglRecycler::pendingEglShaders() const {
    Mutex::Autolock lock(mLock);
    return mEglShaderList.size();
}
