#include "support/camera_frames.h"

#include <stdlib.h>

#include <algorithm>

#include "core/egl/EglProgram.h"
#include "kivhost/VirtualCamera.h"
#include "support/effect_renderer.h"
#include "support/image_ptr.h"
#include "vccore/vc_convert.h"

std::vector<uint8_t> CameraFrames_nv21(uint64_t index, int width, int height) {
    std::vector<uint8_t> nv21(VCImage_requiredSize(width, height, VC_FORMAT_NV21));
    ImagePtr frame(VCImage_createWrap(nv21.data(), width, height, VC_FORMAT_NV21, 0, 0));
    auto generator = kivhost::VirtualCamera_generator(width, height);
    if (generator == nullptr || !generator->render(index, frame.get())) nv21.clear();
    return nv21;
}

std::vector<uint8_t> CameraFrames_rgba(uint64_t index, int width, int height) {
    std::vector<uint8_t> nv21 = CameraFrames_nv21(index, width, height);
    std::vector<uint8_t> rgba((size_t)width * height * 4);
    ImagePtr in(VCImage_createWrap(nv21.data(), width, height, VC_FORMAT_NV21, 0, 0));
    ImagePtr out(VCImage_createWrap(rgba.data(), width, height, VC_FORMAT_RGBA, 0, 0));
    if (nv21.empty() || VCImage_convert(in.get(), out.get()) != 0) rgba.clear();
    return rgba;
}

ExternalTextureDrawer::ExternalTextureDrawer(int width, int height)
    : mWidth(width), mHeight(height) {
    if (!GlTest_makeTarget(width, height, &mTarget)) return;
    mProgram = EffectRenderer_identityProgram(width, height);
    mOk = mProgram != nullptr;
}

ExternalTextureDrawer::~ExternalTextureDrawer() {
    if (mProgram != nullptr) mProgram->release();
    GlTest_deleteTarget(&mTarget);
}

std::vector<uint8_t> ExternalTextureDrawer::draw(GLuint texture) {
    if (!mOk) return {};
    glBindFramebuffer(GL_FRAMEBUFFER, mTarget.framebuffer);
    glActiveTexture(GL_TEXTURE0);
    glBindTexture(GL_TEXTURE_EXTERNAL_OES, texture);
    glClearColor(0, 0, 0, 1);
    glClear(GL_COLOR_BUFFER_BIT);
    if (mProgram->onDrawFrame() != 0) return {};
    return GlTest_readPixels(mWidth, mHeight);
}
