// EglImage on real Mesa: the four kinds, the GraphicBuffer writes (copy,
// conversion, YUV resize), and every status and error line in one table (the
// fixture sees what failures leave behind). How an NV21 buffer looks through
// the default external shader: egl_window_test.
#include "core/egl/EglImage.h"

#include <gtest/gtest.h>
#include <ui/GraphicBuffer.h>

#include <algorithm>
#include <functional>
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
    ASSERT_EQ(target->initialize(), 0);
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

    nv21->release();
    rgba->release();
}

TEST_F(EglImageTest, SmallerYuvIsResizedPlaneByPlane) {
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
    image->release();
}

// Every status and error line of EglImage, one call a row; a failed
// initialize leaves no GL object (the fixture counts them) and no buffer.
TEST_F(EglImageTest, LogLinesAndStatuses) {
    const std::string kImage = "core/egl/EglImage:#";
    sp<EglImage> fresh = new EglImage(EglImage::IMAGE_FRAMEBUFFER, 4, 4);
    sp<EglImage> nv21 = external(EglImage::IMAGE_EXTERNAL, 8, 4, VC_FORMAT_NV21);
    ASSERT_EQ(nv21->initialize(), 0);
    ImagePtr rgba(VCImage_createNew(4, 2, VC_FORMAT_RGBA));
    ImagePtr empty(VCImage_createEmpty(4, 2, VC_FORMAT_RGBA));  // no data
    auto init = [&](sp<EglImage> image) {
        int status = image->initialize();
        EXPECT_FALSE(image->isInitialized());
        EXPECT_EQ(image->getTextureID() + image->getFrameBufferID(), 0u);
        EXPECT_EQ(image->getGraphicBuffer(), nullptr);
        return status;
    };
    const struct {
        std::function<int()> call;
        int status;
        std::vector<std::string> lines;
    } rows[] = {
        // clang-format off
        {[&] { return fresh->bindTexture(); }, VC_ERROR_INVALID_STATE,
         {"E EGL: bindTexture mInitialized == false"}},
        {[&] { return fresh->bindFrameBuffer(); }, VC_ERROR_INVALID_STATE,
         {"E EGL: bindFrameBuffer mInitialized == false"}},
        {[&] { return fresh->flushCache(); }, VC_ERROR_INVALID_STATE, {"E EGL: not initialized"}},
        {[&] { return fresh->getImageData() == nullptr ? -100 : 0; }, -100,
         {"E EGL: not initialized"}},
        // An incomplete (0x0) framebuffer; a GL call that fails on the way.
        {[&] { return init(new EglImage(EglImage::IMAGE_FRAMEBUFFER, 0, 0)); },
         VC_ERROR_INVALID_STATE, {"E VC_ERROR_INVALID_STATE (-7): " + kImage}},
        {[&] { return init(new EglImage(EglImage::IMAGE_FRAMEBUFFER, -1, 4)); }, VC_ERROR_UNKNOWN,
         {"E GL Error: 0x0501 'GL_INVALID_VALUE' - glTexImage2D(GL_TEXTURE_2D, 0, GL_RGBA, mWidth, "
          "mHeight, 0, GL_RGBA, GL_UNSIGNED_BYTE, NULL) at " + kImage,
          "E VC_ERROR_UNKNOWN (-1): " + kImage}},
        // The two spellings differ on purpose.
        {[&] { return init(external(EglImage::IMAGE_EXTERNAL, 8, 8, VC_FORMAT_RGB8)); },
         VC_ERROR_UNSUPPORTED, {"E Unsupported format for the EglImage: RGB8",
                                "E VC_ERROR_UNSUPPORTED (-6): " + kImage}},
        {[&] { return init(external(EglImage::IMAGE_EXTERNAL, 8, 8, VC_FORMAT_YUYV)); },
         VC_ERROR_UNSUPPORTED, {"E Unsupported format for the EgImage: YUYV",
                                "E VC_ERROR_UNSUPPORTED (-6): " + kImage}},
        {[&] { return init(new EglImage(nullptr, EglImage::IMAGE_EXTERNAL, 8, 8, VC_FORMAT_NV21)); },
         VC_ERROR_INVALID_STATE,
         {"E EGL: an EglImage on a GraphicBuffer needs an EglEnvironment",
          "E VC_ERROR_INVALID_STATE (-7): " + kImage}},
        // 4:2:0 needs even sizes: the buffer itself cannot be allocated.
        {[&] { return init(external(EglImage::IMAGE_EXTERNAL, 7, 5, VC_FORMAT_NV21)); },
         VC_ERROR_ALLOC_FAILED, {"E GraphicBuffer: cannot allocate 7x5 format 17 (stride 7)",
                                 "E Failed to initialize GraphicBuffer. Error: Invalid argument.",
                                 "E VC_ERROR_ALLOC_FAILED (-5): " + kImage}},
        {[&] { return nv21->setImageData(*empty, GL_CLAMP_TO_EDGE); }, VC_ERROR_NULL_PARAM,
         {"E VC_ERROR_NULL_PARAM (-2): " + kImage}},
        // A refused write still gives the buffer back.
        {[&] {
             int status = nv21->setImageData(*rgba, GL_CLAMP_TO_EDGE);
             void* pixels = nullptr;
             EXPECT_EQ(nv21->getGraphicBuffer()->lock(0x3, &pixels), android::NO_ERROR);
             nv21->getGraphicBuffer()->unlock();
             return status;
         }, VC_ERROR_INVALID_PARAM, {"E EGL: lockGraphicBuffer format : 11, width : 8, stride : 8",
                                     "E Incompatible image : 4x2 'RGBA' --> 8x4 'NV21'",
                                     "E VC_ERROR_INVALID_PARAM (-3): " + kImage}},
        // clang-format on
    };
    for (size_t i = 0; i < sizeof(rows) / sizeof(rows[0]); ++i) {
        LogCapture log;
        EXPECT_EQ(rows[i].status, rows[i].call()) << "row " << i;
        EXPECT_TRUE(log.matches(rows[i].lines)) << "row " << i;
    }
    nv21->release();
}

}  // namespace
