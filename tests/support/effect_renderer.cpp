#include "support/effect_renderer.h"

#include "core/KivFilter.h"
#include "core/egl/EglProgram.h"

EffectRenderer::EffectRenderer(const lookref::Picture& picture)
    : mWidth(picture.width()), mHeight(picture.height()) {
    if (!GlTest_makeExternalTexture(mWidth, mHeight, picture.rgba().data(), &mTexture)) return;
    glActiveTexture(GL_TEXTURE0);
    glBindTexture(GL_TEXTURE_EXTERNAL_OES, mTexture.external);
    glTexParameterf(GL_TEXTURE_EXTERNAL_OES, GL_TEXTURE_MIN_FILTER, GL_LINEAR);
    glTexParameterf(GL_TEXTURE_EXTERNAL_OES, GL_TEXTURE_MAG_FILTER, GL_LINEAR);
    if (!GlTest_makeTarget(mWidth, mHeight, &mTarget)) return;
    mProgram = EffectRenderer_identityProgram(mWidth, mHeight);
    mOk = mProgram != nullptr;
}

android::sp<EglProgram> EffectRenderer_identityProgram(int width, int height) {
    android::sp<EglProgram> program = new EglProgram();
    program->setCameraGeometryType(EglProgram::GEOMETRY_NORMAL, 0);
    if (program->initialize(10, false) != 0) {
        program->release();
        return nullptr;
    }
    program->setCameraGeometry(width, height, 0, 0);
    program->setPreviewGeometry(width, height, false);
    return program;
}

EffectRenderer::~EffectRenderer() {
    if (mProgram != nullptr) {
        mProgram->setFilter(nullptr);
        mProgram->getRecycler()->recycle();
        mProgram->release();
        mProgram.clear();
    }
    GlTest_deleteTarget(&mTarget);
    glBindTexture(GL_TEXTURE_EXTERNAL_OES, 0);
    GlTest_deleteExternalTexture(&mTexture);
}

int EffectRenderer::draw(KivFilter* effect) {
    if (!mOk) return -100;
    if (effect != mEffect) {
        mProgram->setFilter(effect);
        mEffect = effect;
    }
    glBindFramebuffer(GL_FRAMEBUFFER, mTarget.framebuffer);
    glActiveTexture(GL_TEXTURE0);
    glBindTexture(GL_TEXTURE_EXTERNAL_OES, mTexture.external);
    glClearColor(0, 0, 0, 1);
    glClear(GL_COLOR_BUFFER_BIT);
    return mProgram->onDrawFrame();
}

std::vector<uint8_t> EffectRenderer::pixels() const {
    if (!mOk) return {};
    glBindFramebuffer(GL_FRAMEBUFFER, mTarget.framebuffer);
    return GlTest_readPixels(mWidth, mHeight);
}

std::vector<uint8_t> EffectRenderer_renderOnce(KivFilter* effect, const lookref::Picture& picture,
                                               int* drawResult) {
    EffectRenderer renderer(picture);
    int result = renderer.draw(effect);
    if (drawResult != nullptr) *drawResult = result;
    return renderer.ok() ? renderer.pixels() : std::vector<uint8_t>();
}
