// A GraphicBuffer handed from one EglImage to the next: taken only when it
// fits, with its pixels; and the buffered processor, which keeps its buffers
// between calls, still giving each call its own picture.
#include <gtest/gtest.h>
#include <ui/GraphicBuffer.h>

#include <vector>

#include "core/VFilterBufferedProcessorImpl.h"
#include "core/egl/EglImage.h"
#include "support/gl_context.h"
#include "support/log_capture.h"
#include "vccore/vc_image.h"

using android::sp;
using Pixels = std::vector<uint8_t>;

namespace {

// Opaque pixels that differ between seeds and from pixel to pixel.
Pixels pattern(int w, int h, int seed) {
    Pixels p(size_t(w) * h * 4);
    for (size_t i = 0; i < p.size(); ++i) p[i] = (i % 4 == 3) ? 255 : uint8_t(i * 7 + seed * 31);
    return p;
}

class EglImageReuseTest : public GlContextTest {
protected:
    sp<EglImage> image(EglImage::IMAGE_TYPE type, int w, int h) {
        return new EglImage(mGl->env(), type, w, h, static_cast<int>(VC_FORMAT_RGBA));
    }
};

TEST_F(EglImageReuseTest, FittingBufferIsTakenWithItsPixelsOthersAreNot) {
    const int w = 8, h = 6;
    Pixels first = pattern(w, h, 1);
    VCImage* picture = VCImage_createWrap(first.data(), w, h, VC_FORMAT_RGBA, 0, 0);
    sp<EglImage> a = image(EglImage::IMAGE_EXTERNAL, w, h);
    ASSERT_EQ(a->initialize(), 0);
    ASSERT_EQ(a->setImageData(*picture, GL_CLAMP_TO_EDGE), 0);
    sp<android::GraphicBuffer> kept = a->getGraphicBuffer();
    a->release();
    ASSERT_NE(kept, nullptr);

    LogCapture log;
    sp<EglImage> b = image(EglImage::IMAGE_EXTERNAL, w, h);
    b->reuseGraphicBuffer(kept);
    ASSERT_EQ(b->initialize(), 0);
    EXPECT_EQ(b->getGraphicBuffer(), kept);
    EXPECT_EQ(log.count("EglImage: Creating GraphicBuffer 8x6 RGBA (format 1, usage 0x00000133)"),
              0u);
    VCImage* read = b->getImageData();
    ASSERT_NE(read, nullptr);
    EXPECT_EQ(Pixels(read->data, read->data + first.size()), first);
    VCImage_destroy(read);
    b->release();
    EXPECT_EQ(b->getGraphicBuffer(), nullptr);

    // Another size, or a render target's usage: a buffer of its own.
    sp<EglImage> wider = image(EglImage::IMAGE_EXTERNAL, w + 2, h);
    wider->reuseGraphicBuffer(kept);
    ASSERT_EQ(wider->initialize(), 0);
    EXPECT_NE(wider->getGraphicBuffer(), kept);
    EXPECT_EQ(wider->getGraphicBuffer()->getWidth(), uint32_t(w + 2));
    sp<EglImage> target = image(EglImage::IMAGE_EXTERNAL_FRAMEBUFFER, w, h);
    target->reuseGraphicBuffer(kept);
    ASSERT_EQ(target->initialize(), 0);
    EXPECT_NE(target->getGraphicBuffer(), kept);
    EXPECT_TRUE(
        log.contains("EglImage: Creating GraphicBuffer 8x6 RGBA (format 1, usage 0x00000333)"));
    // Once initialised, an image keeps the buffer it has.
    sp<android::GraphicBuffer> own = target->getGraphicBuffer();
    target->reuseGraphicBuffer(kept);
    EXPECT_EQ(target->getGraphicBuffer(), own);
    wider->release();
    target->release();
    VCImage_destroy(picture);
}

class ProcessorReuseTest : public ::testing::Test {
protected:
    void SetUp() override {
        mProcessor = static_cast<VFilterBufferedProcessorImpl*>(BufferedProcessor_Create());
        ASSERT_NE(mProcessor, nullptr);
        ASSERT_EQ(mProcessor->initialize(), 0);
        mProcessor->setEffect(400);
    }
    void TearDown() override {
        mProcessor->release();
        BufferedProcessor_Destroy(mProcessor);
    }
    // The pass-through result of one RGBA call.
    Pixels passThrough(const Pixels& in, int w, int h) {
        Pixels out(in.size(), 0);
        EXPECT_EQ(mProcessor->doProcessRGBA(in.data(), w, h, out.data(), VC_FORMAT_RGBA), 0);
        return out;
    }
    VFilterBufferedProcessorImpl* mProcessor = nullptr;
};

TEST_F(ProcessorReuseTest, EveryCallGivesItsOwnPictureAcrossSizesAndFormats) {
    // Same size in a row, another size, back again: nothing of an earlier call shows.
    const int sizes[][2] = {{16, 8}, {16, 8}, {16, 8}, {10, 4}, {16, 8}};
    int seed = 0;
    for (const auto& s : sizes) {
        Pixels in = pattern(s[0], s[1], ++seed);
        EXPECT_EQ(passThrough(in, s[0], s[1]), in) << s[0] << "x" << s[1] << " seed " << seed;
    }
    // NV21 of the same size between two RGBA calls: the source's format changes twice.
    const int w = 16, h = 8;
    Pixels nv21(w * h * 3 / 2, 128);
    for (int i = 0; i < w * h; ++i) nv21[i] = uint8_t(40 + i);
    Pixels out(w * h * 4, 0);
    ASSERT_EQ(mProcessor->doProcessNV21(nv21.data(), w, h, out.data()), 0);
    // Neutral chroma: every channel is the luma (full range).
    for (int i = 0; i < w * h; ++i) EXPECT_NEAR(out[i * 4], nv21[i], 2) << i;
    Pixels in = pattern(w, h, ++seed);
    EXPECT_EQ(passThrough(in, w, h), in);
    // After release() the processor starts over with nothing kept.
    mProcessor->release();
    ASSERT_EQ(mProcessor->initialize(), 0);
    mProcessor->setEffect(400);
    EXPECT_EQ(passThrough(in, w, h), in);
}

}  // namespace
