// EglImage on real Mesa: the four kinds, their failures (the fixture sees
// what they leave behind), the GraphicBuffer writes (copy, conversion, YUV
// resize), and an NV21 picture drawn by the default external shader against
// the image core's NV21 -> RGBA conversion.
#include "core/egl/EglImage.h"

#include <gtest/gtest.h>
#include <ui/GraphicBuffer.h>

#include <algorithm>
#include <string>
#include <vector>

#include "core/egl/EglEnvironment.h"
#include "core/egl/EglProgram.h"
#include "support/gl_context.h"
#include "support/image_ptr.h"
#include "support/log_capture.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_image.h"
#include "vccore/vc_log.h"

using android::sp;
using Pixels = std::vector<uint8_t>;

namespace {

// GL rows: lower-left quarter red, lower-right green, upper half blue.
void renderQuadrants(int w, int h) {
    glViewport(0, 0, w, h);
    glEnable(GL_SCISSOR_TEST);
    const int parts[3][4] = {{0, 0, w / 2, h / 2}, {w / 2, 0, w - w / 2, h / 2}, {0, h / 2, w, h}};
    for (int i = 0; i < 3; i++) {
        glScissor(parts[i][0], parts[i][1], parts[i][2], parts[i][3]);
        glClearColor(i == 0, i == 1, i == 2, 1.0f);
        glClear(GL_COLOR_BUFFER_BIT);
    }
    glDisable(GL_SCISSOR_TEST);
}

Pixels expectedQuadrants(int w, int h) {
    Pixels pixels;
    for (int y = 0; y < h; ++y) {
        for (int x = 0; x < w; ++x) {
            int part = y >= h / 2 ? 2 : x < w / 2 ? 0 : 1;
            pixels.insert(pixels.end(), {uint8_t(part == 0 ? 255 : 0), uint8_t(part == 1 ? 255 : 0),
                                         uint8_t(part == 2 ? 255 : 0), 255});
        }
    }
    return pixels;
}

// The first n bytes of a read-back record, which is then destroyed.
Pixels take(VCImage* image, size_t n) {
    EXPECT_NE(image, nullptr);
    if (image == nullptr) return Pixels();
    Pixels out(image->data, image->data + n);
    VCImage_destroy(image);
    return out;
}

TEST(EglImageStateTest, OperationsBeforeInitializeLogAndFail) {
    sp<EglImage> image = new EglImage(EglImage::IMAGE_FRAMEBUFFER, 4, 4);
    LogCapture log;
    EXPECT_NE(image->bindTexture(), 0);
    EXPECT_TRUE(log.contains(VF_LOG_ERROR, "EGL: bindTexture mInitialized == false"));
    EXPECT_NE(image->bindFrameBuffer(), 0);
    EXPECT_TRUE(log.contains(VF_LOG_ERROR, "EGL: bindFrameBuffer mInitialized == false"));
    log.clear();
    EXPECT_EQ(image->getImageData(), nullptr);
    EXPECT_NE(image->flushCache(), 0);
    EXPECT_EQ(log.count("EGL: not initialized"), 2u);
    EXPECT_EQ(image->getTextureID(), 0u);
    // No GL call was made: there is no context on this thread to make one.
    EXPECT_EQ(eglGetCurrentContext(), EGL_NO_CONTEXT);
}

class EglImageTest : public GlContextTest {
protected:
    sp<EglImage> external(EglImage::IMAGE_TYPE type, int w, int h, uint32_t format) {
        return new EglImage(mGl->env(), type, w, h, static_cast<int>(format));
    }
};

TEST_F(EglImageTest, TextureAndFramebufferKinds) {
    const int w = 10, h = 6;
    sp<EglImage> texture = new EglImage(EglImage::IMAGE_TEXTURE, w, h);
    ASSERT_EQ(texture->initialize(), 0);
    ASSERT_NE(texture->getTextureID(), 0u);
    EXPECT_EQ(texture->getImageData(), nullptr);
    Pixels pixels = expectedQuadrants(w, h);
    ASSERT_EQ(texture->setImageData(pixels.data(), GL_CLAMP_TO_EDGE), 0);
    GLint wrap = 0;
    glGetTexParameteriv(GL_TEXTURE_2D, GL_TEXTURE_WRAP_S, &wrap);
    EXPECT_EQ(wrap, GL_CLAMP_TO_EDGE);
    // What was uploaded is what the texture holds.
    GLuint probe = 0;
    glGenFramebuffers(1, &probe);
    glBindFramebuffer(GL_FRAMEBUFFER, probe);
    glFramebufferTexture2D(GL_FRAMEBUFFER, GL_COLOR_ATTACHMENT0, GL_TEXTURE_2D,
                           texture->getTextureID(), 0);
    EXPECT_EQ(GlTest_readPixels(w, h), pixels);
    // A record is uploaded as width x height RGBA bytes whatever its format
    // (no swizzle for BGRA), unless it holds fewer bytes than that.
    Pixels bytes(w * h * 4);
    for (size_t i = 0; i < bytes.size(); ++i) bytes[i] = (uint8_t)(i * 7 + 3);
    ASSERT_EQ(texture->setImageData(*VCImageTest_wrap(bytes.data(), w, h, VC_FORMAT_BGRA),
                                    GL_CLAMP_TO_EDGE),
              0);
    EXPECT_EQ(
        texture->setImageData(*ImagePtr(VCImage_createNew(w, h, VC_FORMAT_NV21)), GL_CLAMP_TO_EDGE),
        VC_ERROR_INVALID_PARAM);
    glBindFramebuffer(GL_FRAMEBUFFER, probe);
    EXPECT_EQ(GlTest_readPixels(w, h), bytes);
    glBindFramebuffer(GL_FRAMEBUFFER, 0);
    glDeleteFramebuffers(1, &probe);

    sp<EglImage> target = new EglImage(EglImage::IMAGE_FRAMEBUFFER, w, h);
    ASSERT_EQ(target->initialize(), 0);
    ASSERT_EQ(target->bindFrameBuffer(), 0);
    renderQuadrants(w, h);
    // Flushing and reading back leave the default framebuffer bound, also
    // when the image's own was bound before.
    EXPECT_EQ(target->flushCache(), 0);
    GLint bound = -1;
    glGetIntegerv(GL_FRAMEBUFFER_BINDING, &bound);
    EXPECT_EQ(bound, 0);
    ASSERT_EQ(target->bindFrameBuffer(), 0);
    ImagePtr read(target->getImageData());
    glGetIntegerv(GL_FRAMEBUFFER_BINDING, &bound);
    EXPECT_EQ(bound, 0);
    ASSERT_NE(read, nullptr);
    EXPECT_EQ(read->format, VC_FORMAT_RGBA);
    EXPECT_EQ(take(read.release(), w * h * 4), expectedQuadrants(w, h));
    // The frame buffer's texture can be sampled.
    EXPECT_EQ(target->bindTexture(), 0);
    glGetIntegerv(GL_TEXTURE_BINDING_2D, &bound);
    EXPECT_EQ((GLuint)bound, target->getTextureID());
    EXPECT_EQ(target->unbindTexture(), 0);

    texture->release();
    target->release();
    EXPECT_FALSE(target->isInitialized());
    EXPECT_EQ(target->getTextureID(), 0u);
}

TEST_F(EglImageTest, GraphicBufferFramebufferRendersIntoCpuVisibleMemory) {
    const int w = 16, h = 8;
    sp<EglImage> target = external(EglImage::IMAGE_EXTERNAL_FRAMEBUFFER, w, h, VC_FORMAT_RGBA);
    LogCapture log;
    ASSERT_EQ(target->initialize(), 0);
    EXPECT_TRUE(
        log.contains("EglImage: Creating GraphicBuffer 16x8 RGBA (format 1, usage 0x00000333)"));
    EXPECT_NE(target->getRenderBufferID(), 0u);
    EXPECT_NE(target->getFrameBufferID(), 0u);
    EXPECT_EQ(target->getTextureID(), 0u);
    ASSERT_NE(target->getGraphicBuffer(), nullptr);

    EXPECT_EQ(target->flushCache(), 0);
    ASSERT_EQ(target->bindFrameBuffer(), 0);
    renderQuadrants(w, h);
    target->unbindFrameBuffer();
    ImagePtr read(target->getImageData());
    ASSERT_NE(read, nullptr);
    EXPECT_EQ(read->wrapped, 1);  // the buffer's own memory...
    EXPECT_EQ(read->format, VC_FORMAT_RGBA);
    // ...handed out under a lock that lasts as long as the record.
    const sp<android::GraphicBuffer>& buffer = target->getGraphicBuffer();
    void* pixels = nullptr;
    EXPECT_EQ(buffer->lock(android::GraphicBuffer::USAGE_SW_READ_OFTEN, &pixels),
              android::INVALID_OPERATION);
    EXPECT_EQ(take(read.release(), w * h * 4), expectedQuadrants(w, h));
    ASSERT_EQ(buffer->lock(android::GraphicBuffer::USAGE_SW_READ_OFTEN, &pixels),
              android::NO_ERROR);
    EXPECT_EQ(buffer->unlock(), android::NO_ERROR);

    // Rendered again: the next read sees the new frame.
    ASSERT_EQ(target->bindFrameBuffer(), 0);
    glClearColor(1.0f, 1.0f, 1.0f, 1.0f);
    glClear(GL_COLOR_BUFFER_BIT);
    target->unbindFrameBuffer();
    EXPECT_EQ(target->flushCache(), 0);
    EXPECT_EQ(take(target->getImageData(), w * h * 4), Pixels(w * h * 4, 255));
    target->release();
    EXPECT_EQ(target->getGraphicBuffer(), nullptr);
}

TEST_F(EglImageTest, BadSizesAndFormatsFailAndLeaveNothing) {
    // An incomplete (0x0) framebuffer.
    sp<EglImage> image = new EglImage(EglImage::IMAGE_FRAMEBUFFER, 0, 0);
    LogCapture log;
    EXPECT_EQ(image->initialize(), VC_ERROR_INVALID_STATE);
    EXPECT_EQ(log.countPrefix("VC_ERROR_INVALID_STATE (-7): core/egl/EglImage:"), 1u);
    EXPECT_EQ(image->getTextureID(), 0u);
    EXPECT_EQ(image->getFrameBufferID(), 0u);
    EXPECT_FALSE(image->isInitialized());
    EXPECT_NE(image->bindFrameBuffer(), 0);
    // A GL call that fails on the way is a GL error (-1), not a state error,
    // and leaves nothing behind either.
    sp<EglImage> negative = new EglImage(EglImage::IMAGE_FRAMEBUFFER, -1, 4);
    log.clear();
    EXPECT_EQ(negative->initialize(), VC_ERROR_UNKNOWN);
    std::vector<std::string> lines = log.texts();
    ASSERT_EQ(lines.size(), 2u);
    EXPECT_EQ(lines[0].rfind("GL Error: 0x0501 'GL_INVALID_VALUE' - glTexImage2D(GL_TEXTURE_2D, 0, "
                             "GL_RGBA, mWidth, mHeight, 0, GL_RGBA, GL_UNSIGNED_BYTE, NULL) at "
                             "core/egl/EglImage:",
                             0),
              0u)
        << lines[0];
    EXPECT_EQ(lines[1].rfind("VC_ERROR_UNKNOWN (-1): core/egl/EglImage:", 0), 0u) << lines[1];
    EXPECT_EQ(negative->getTextureID(), 0u);
    EXPECT_EQ(negative->getFrameBufferID(), 0u);

    // The two log lines differ in spelling on purpose.
    sp<EglImage> rgb = external(EglImage::IMAGE_EXTERNAL, 8, 8, VC_FORMAT_RGB8);
    EXPECT_EQ(rgb->initialize(), VC_ERROR_UNSUPPORTED);
    EXPECT_TRUE(log.contains(VF_LOG_ERROR, "Unsupported format for the EglImage: RGB8"));
    sp<EglImage> yuyv = external(EglImage::IMAGE_EXTERNAL, 8, 8, VC_FORMAT_YUYV);
    EXPECT_EQ(yuyv->initialize(), VC_ERROR_UNSUPPORTED);
    EXPECT_TRUE(log.contains(VF_LOG_ERROR, "Unsupported format for the EgImage: YUYV"));
    EXPECT_EQ(yuyv->getGraphicBuffer(), nullptr);
    sp<EglImage> noEnv = new EglImage(EglImage::IMAGE_EXTERNAL, 8, 8);
    EXPECT_NE(noEnv->initialize(), 0);
    // 4:2:0 needs even sizes: the buffer itself cannot be allocated.
    sp<EglImage> odd = external(EglImage::IMAGE_EXTERNAL, 7, 5, VC_FORMAT_NV21);
    EXPECT_EQ(odd->initialize(), VC_ERROR_ALLOC_FAILED);
    EXPECT_TRUE(
        log.contains(VF_LOG_ERROR, "Failed to initialize GraphicBuffer. Error: Invalid argument."));
    EXPECT_EQ(odd->getGraphicBuffer(), nullptr);
}

TEST_F(EglImageTest, WritesCopyOrConvertIntoTheBuffer) {
    // Same size and format: a copy.
    sp<EglImage> rgba = external(EglImage::IMAGE_EXTERNAL, 4, 2, VC_FORMAT_RGBA);
    ASSERT_EQ(rgba->initialize(), 0);
    ImagePtr source(VCImage_createNew(4, 2, VC_FORMAT_RGBA));
    for (int i = 0; i < 32; ++i) source->data[i] = (uint8_t)(i * 5);
    ASSERT_EQ(rgba->setImageData(*source, GL_CLAMP_TO_EDGE), 0);
    EXPECT_EQ(take(rgba->getImageData(), 32), Pixels(source->data, source->data + 32));

    // Same size, other format: converted into the buffer's NV21 (luma checked).
    sp<EglImage> nv21 = external(EglImage::IMAGE_EXTERNAL, 4, 2, VC_FORMAT_NV21);
    ASSERT_EQ(nv21->initialize(), 0);
    ASSERT_EQ(nv21->setImageData(*source, GL_CLAMP_TO_EDGE), 0);
    ImagePtr read(nv21->getImageData());
    ASSERT_NE(read, nullptr);
    EXPECT_EQ(read->format, VC_FORMAT_NV21);
    for (int i = 0; i < 8; ++i) {
        const uint8_t* p = source->data + i * 4;
        EXPECT_EQ(read->data[i], (19595 * p[0] + 38470 * p[1] + 7471 * p[2]) >> 16) << i;
    }

    VCImage empty;  // no data
    empty.width = 4;
    empty.height = 2;
    empty.format = VC_FORMAT_RGBA;
    EXPECT_EQ(nv21->setImageData(empty, GL_CLAMP_TO_EDGE), VC_ERROR_NULL_PARAM);
    nv21->release();
    rgba->release();
}

TEST_F(EglImageTest, SmallerYuvIsResizedAndOtherSizesAreIncompatible) {
    const int sw = 640, sh = 480, dw = 1280, dh = 720;
    sp<EglImage> image = external(EglImage::IMAGE_EXTERNAL, dw, dh, VC_FORMAT_NV21);
    ASSERT_EQ(image->initialize(), 0);
    ImagePtr source(VCImage_createNew(sw, sh, VC_FORMAT_NV21));
    // Luma encodes the position; V the chroma row, U the chroma column + 1.
    for (int i = 0; i < sw * sh; ++i) source->data[i] = (uint8_t)((i % sw) * 7 + (i / sw) * 3);
    uint8_t* chroma = source->data + sw * sh;
    for (int i = 0; i < sw * sh / 2; i += 2) {
        chroma[i] = (uint8_t)(i / sw);
        chroma[i + 1] = (uint8_t)((i % sw) / 2 + 1);
    }
    ASSERT_EQ(image->setImageData(*source, GL_CLAMP_TO_EDGE), 0);
    ImagePtr read(image->getImageData());
    ASSERT_NE(read, nullptr);
    ASSERT_EQ(read->width, dw);
    // Each output sample comes from the source sample under its centre.
    for (int y = 0; y < dh; y += 37) {
        for (int x = 0; x < dw; x += 13) {
            int sx = (int)((x + 0.5) * sw / dw), sy = (int)((y + 0.5) * sh / dh);
            ASSERT_EQ(read->data[y * dw + x], source->data[sy * sw + sx]) << x << "," << y;
        }
    }
    const uint8_t* outChroma = read->data + dw * dh;
    for (int y = 0; y < dh / 2; y += 11) {
        for (int x = 0; x < dw / 2; x += 7) {
            int sx = (int)((x + 0.5) * (sw / 2) / (dw / 2));
            int sy = (int)((y + 0.5) * (sh / 2) / (dh / 2));
            ASSERT_EQ(outChroma[y * dw + 2 * x], (uint8_t)sy) << x << "," << y;
            ASSERT_EQ(outChroma[y * dw + 2 * x + 1], (uint8_t)(sx + 1)) << x << "," << y;
        }
    }
    read.reset();  // gives back the read lock it holds on the buffer
    ImagePtr rgba(VCImage_createNew(sw, sh, VC_FORMAT_RGBA));
    LogCapture log;
    EXPECT_EQ(image->setImageData(*rgba, GL_CLAMP_TO_EDGE), VC_ERROR_INVALID_PARAM);
    EXPECT_TRUE(
        log.contains(VF_LOG_ERROR, "Incompatible image : 640x480 'RGBA' --> 1280x720 'NV21'"));
    // The failed write still gave the buffer back.
    void* pixels = nullptr;
    EXPECT_EQ(image->getGraphicBuffer()->lock(0x3, &pixels), android::NO_ERROR);
    image->getGraphicBuffer()->unlock();
    image->release();
}

TEST_F(EglImageTest, Nv21DrawnThroughTheDefaultShaderMatchesTheCpuConversion) {
    const int w = 64;
    const int h = 48;
    ImagePtr picture(VCImage_createNew(w, h, VC_FORMAT_NV21));
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
    program->setCameraGeometry(w, h, 0, 0);
    program->setPreviewGeometry(w, h, false);
    // The flush leaves the default framebuffer bound, so the target is bound after it.
    ASSERT_EQ(target->flushCache(), 0);
    ASSERT_EQ(target->bindFrameBuffer(), 0);
    ASSERT_EQ(program->onDrawFrame(), 0);
    glFinish();
    target->unbindFrameBuffer();
    source->unbindTexture();

    ImagePtr result(target->getImageData());
    ASSERT_NE(result, nullptr);
    // What the GPU shows must be the image core's own NV21 -> RGBA; 1 allows
    // for the shader's float output rounding (llvmpipe: exact).
    ImagePtr expected(VCImage_createNew(w, h, VC_FORMAT_RGBA));
    ASSERT_EQ(VCImage_convert(picture.get(), expected.get()), 0);
    for (int i = 0; i < w * h; ++i) {
        const uint8_t* p = result->data + i * 4;
        const uint8_t* want = expected->data + i * 4;
        for (int c = 0; c < 3; ++c) {
            ASSERT_NEAR(p[c], want[c], 1) << "pixel " << i % w << "," << i / w << " channel " << c;
        }
        ASSERT_EQ(p[3], 255);
    }
    program->release();
    source->release();
    target->release();
}

}  // namespace
