// An NV21 picture written into an external GraphicBuffer image and drawn by
// the program's default external shader into a GraphicBuffer framebuffer,
// against an independent full-range NV21 -> RGBA computation.
#include <gtest/gtest.h>

#include <algorithm>
#include <vector>

#include "core/egl/EglImage.h"
#include "core/egl/EglProgram.h"
#include "support/gl_context.h"
#include "vccore/vc_image.h"

using android::sp;

namespace {

int clamp255(int v) {
    return v < 0 ? 0 : v > 255 ? 255 : v;
}

class EglImageExternalTest : public GlContextTest {};

TEST_F(EglImageExternalTest, Nv21DrawnThroughTheDefaultShaderMatchesTheCpuConversion) {
    const int w = 64;
    const int h = 48;
    VCImage* picture = VCImage_createNew(w, h, VC_FORMAT_NV21);
    ASSERT_NE(picture, nullptr);
    // Gradients and strong chroma so that clamping happens too.
    for (int y = 0; y < h; ++y) {
        for (int x = 0; x < w; ++x) picture->data[y * w + x] = (uint8_t)((x * 4 + y * 5) % 256);
    }
    for (int i = 0; i < w * h / 2; i += 2) {
        picture->data[w * h + i] = (uint8_t)((i * 13) % 256);      // V
        picture->data[w * h + i + 1] = (uint8_t)((i * 29) % 256);  // U
    }

    sp<EglImage> target =
        new EglImage(mGl->env(), EglImage::IMAGE_EXTERNAL_FRAMEBUFFER, w, h, (int)VC_FORMAT_RGBA);
    sp<EglImage> source =
        new EglImage(mGl->env(), EglImage::IMAGE_EXTERNAL, w, h, (int)VC_FORMAT_NV21);
    ASSERT_EQ(target->initialize(), 0);
    glActiveTexture(GL_TEXTURE0);
    ASSERT_EQ(source->initialize(), 0);
    ASSERT_EQ(source->bindTexture(), 0);
    ASSERT_EQ(source->setImageData(*picture, GL_CLAMP_TO_EDGE), 0);

    sp<EglProgram> program = new EglProgram();
    program->setCameraGeometryType(EglProgram::GEOMETRY_NORMAL, 0);
    ASSERT_EQ(program->initialize(10, false), 0);
    ASSERT_EQ(target->bindFrameBuffer(), 0);
    program->setCameraGeometry(w, h, 0, 0);
    program->setPreviewGeometry(w, h, false);
    // As the buffered processor does: flush with the target bound, then draw.
    ASSERT_EQ(target->flushCache(), 0);
    GLint bound = 0;
    glGetIntegerv(GL_FRAMEBUFFER_BINDING, &bound);
    ASSERT_EQ((GLuint)bound, target->getFrameBufferID());
    ASSERT_EQ(program->onDrawFrame(), 0);
    glFinish();
    target->unbindFrameBuffer();
    source->unbindTexture();

    VCImage* result = target->getImageData();
    ASSERT_NE(result, nullptr);
    int worst = 0;
    for (int y = 0; y < h; ++y) {
        for (int x = 0; x < w; ++x) {
            // Full-range NV21 -> RGB, truncated then clamped.
            const uint8_t* vu = picture->data + w * h + (y / 2) * w + (x / 2) * 2;
            int luma = picture->data[y * w + x];
            double v = vu[0] - 128.0, u = vu[1] - 128.0;
            const int rgb[3] = {clamp255((int)(luma + 1.402 * v)),
                                clamp255((int)(luma - 0.34414 * u - 0.71414 * v)),
                                clamp255((int)(luma + 1.772 * u))};
            const uint8_t* p = result->data + (y * w + x) * 4;
            for (int c = 0; c < 3; ++c) {
                worst = std::max(worst, abs(p[c] - rgb[c]));
                ASSERT_NEAR(p[c], rgb[c], 1) << "pixel " << x << "," << y << " channel " << c;
            }
            ASSERT_EQ(p[3], 255);
        }
    }
    RecordProperty("worst_difference", worst);
    VCImage_destroy(result);
    VCImage_destroy(picture);
    program->release();
    source->release();
    target->release();
}

}  // namespace
