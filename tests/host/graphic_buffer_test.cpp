// The host GraphicBuffer: layouts, lock rules, and the two sync points
// between its CPU pixels and its GPU mirror, on real Mesa.
// kiv-test-labels: threads
#include <ui/GraphicBuffer.h>

#include <gtest/gtest.h>

#include <thread>
#include <vector>

#include "core/egl/EglEnvironment.h"
#include "core/egl/EglNativeSeam.h"
#include "core/egl/HalPixelFormat.h"
#include "core/egl/EglWindowSurface.h"
#include "graphic_buffer_usage.h"
#include "host/ui/GraphicBufferTestSeam.h"
#include "support/gl_context.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_image.h"

using android::GraphicBuffer;
using android::sp;
using Seam = android::GraphicBufferTestSeam;

namespace {

// Locks and returns the CPU pixels (null on failure, which fails the test).
uint8_t* lock(const sp<GraphicBuffer>& buffer, uint32_t usage) {
    void* address = nullptr;
    EXPECT_EQ(buffer->lock(usage, &address), android::NO_ERROR);
    return static_cast<uint8_t*>(address);
}

// After GlTest_fillHalves: memory rows 0..h/2-1 red, the rest blue.
void expectHalves(const uint8_t* pixels, int w, int h, size_t pitch) {
    for (int y = 0; y < h; ++y) {
        const uint8_t* p = pixels + y * pitch + (w - 1) * 4;
        ASSERT_EQ(p[0], y < h / 2 ? 255 : 0) << "row " << y;
        ASSERT_EQ(p[2], y < h / 2 ? 0 : 255) << "row " << y;
        ASSERT_EQ(p[3], 255) << "row " << y;
    }
}

TEST(GraphicBufferLayout, AllocationLocksAndPlanes) {
    sp<GraphicBuffer> empty = new GraphicBuffer();
    EXPECT_EQ(empty->initCheck(), android::NO_INIT);
    void* pixels = nullptr;
    EXPECT_EQ(empty->lock(kRead, &pixels), android::NO_INIT);
    // Odd 4:2:0 width, unsupported format, stride below width.
    sp<GraphicBuffer> bad[] = {
        new GraphicBuffer(7, 4, HAL_PIXEL_FORMAT_YCrCb_420_SP, kTextureUsage),
        new GraphicBuffer(8, 4, HAL_PIXEL_FORMAT_RGB_565, kTextureUsage),
        new GraphicBuffer(8, 4, HAL_PIXEL_FORMAT_RGBA_8888, kTextureUsage, 6u, "t")};
    for (const auto& b : bad) EXPECT_EQ(b->initCheck(), android::BAD_VALUE);

    sp<GraphicBuffer> rgba =
        new GraphicBuffer(10, 4, HAL_PIXEL_FORMAT_RGBA_8888, kTextureUsage, 16u, "t");
    ASSERT_EQ(rgba->initCheck(), android::NO_ERROR);
    EXPECT_EQ(rgba->getStride(), 16u);
    EXPECT_EQ(rgba->lock(GraphicBuffer::USAGE_HW_TEXTURE, &pixels), android::BAD_VALUE);
    EXPECT_EQ(rgba->unlock(), android::INVALID_OPERATION);
    ASSERT_NE(lock(rgba, kWrite), nullptr);
    EXPECT_EQ(rgba->lock(kRead, &pixels), android::INVALID_OPERATION);
    android_ycbcr ycbcr;
    EXPECT_EQ(rgba->lockYCbCr(kRead, &ycbcr), android::BAD_VALUE);
    EXPECT_EQ(rgba->unlock(), android::NO_ERROR);

    // Chroma planes of 8x6 buffers: {format, cr offset, cb offset, cstride, step}.
    const int planes[3][5] = {{HAL_PIXEL_FORMAT_YCrCb_420_SP, 48, 49, 8, 2},  // V first
                              {HAL_PIXEL_FORMAT_VENDOR_YCbCr_420_SP, 49, 48, 8, 2},
                              {HAL_PIXEL_FORMAT_YV12, 48, 60, 4, 1}};  // V plane, then U
    for (const auto& p : planes) {
        sp<GraphicBuffer> yuv = new GraphicBuffer(8, 6, p[0], kTextureUsage);
        ASSERT_EQ(yuv->lockYCbCr(kRead, &ycbcr), android::NO_ERROR) << p[0];
        uint8_t* y = static_cast<uint8_t*>(ycbcr.y);
        EXPECT_EQ(static_cast<uint8_t*>(ycbcr.cr), y + p[1]) << p[0];
        EXPECT_EQ(static_cast<uint8_t*>(ycbcr.cb), y + p[2]) << p[0];
        EXPECT_EQ(ycbcr.ystride, 8u);
        EXPECT_EQ(ycbcr.cstride, (size_t)p[3]) << p[0];
        EXPECT_EQ(ycbcr.chroma_step, (size_t)p[4]) << p[0];
        EXPECT_EQ(yuv->unlock(), android::NO_ERROR);
    }
}

class GraphicBufferSyncTest : public GlContextTest {
protected:
    EGLDisplay display() { return mGl->env()->getEGLDisplay(); }
};

// The image core's conversion of a compact picture.
std::vector<uint8_t> converted(const uint8_t* pixels, int w, int h, uint32_t from, uint32_t to) {
    VCImage* source = VCImage_createWrap(const_cast<uint8_t*>(pixels), w, h, from, 0, 0);
    VCImage* target = VCImage_createNew(w, h, to);
    EXPECT_EQ(VCImage_convert(source, target), 0);
    std::vector<uint8_t> out(target->data, target->data + VCImage_size(target));
    VCImage_destroy(target);
    VCImage_destroy(source);
    return out;
}

TEST_F(GraphicBufferSyncTest, CpuWritesReachTheGpuWithRowsAndStrideKept) {
    const int w = 6, h = 4;
    sp<GraphicBuffer> buffer =
        new GraphicBuffer(w, h, HAL_PIXEL_FORMAT_RGBA_8888, kTextureUsage, 8u, "t");
    GlBufferView view(display(), buffer);
    ASSERT_TRUE(view.ok());

    uint8_t* rows = lock(buffer, kWrite);
    ASSERT_NE(rows, nullptr);
    std::vector<uint8_t> expected;
    for (int yy = 0; yy < h; ++yy) {
        for (int x = 0; x < 8; ++x) {
            uint8_t px[4] = {(uint8_t)(x * 40), (uint8_t)(yy * 60), (uint8_t)(x + yy), 255};
            memcpy(rows + (yy * 8 + x) * 4, px, 4);
            if (x < w) expected.insert(expected.end(), px, px + 4);
        }
    }
    ASSERT_EQ(buffer->unlock(), android::NO_ERROR);
    view.bind();
    EXPECT_EQ(GlTest_readPixels(w, h), expected);
}

// Every 4:2:0 layout crosses as the image core's full-range conversion, both
// ways and whatever its row padding: through GPU storage the CPU reaches
// (rows packed at 16 pixels, padded at 8) and through GL transfers (when the
// driver cannot share memory). Planes are written and read through
// lockYCbCr; the compact reference is laid out here.
struct YuvCase {
    int format;
    uint32_t fourcc;
    int width;
    int stride;
    bool shared;
};

std::ostream& operator<<(std::ostream& out, const YuvCase& c) {
    return out << std::string((const char*)&c.fourcc, 4) << " " << c.width << " stride " << c.stride
               << (c.shared ? " shared" : " GL transfers");
}

class GraphicBufferYuvTest : public GraphicBufferSyncTest,
                             public ::testing::WithParamInterface<YuvCase> {
protected:
    void TearDown() override {
        Seam::allowSharedStorage(true);
        GraphicBufferSyncTest::TearDown();
    }
};

// Visits every sample of the planes: luma (x, y), then chroma (cx, cy) with
// its U and V addresses in the locked buffer and offsets in a compact picture.
template <typename Luma, typename Chroma>
void forPlanes(const YuvCase& c, int h, const android_ycbcr& planes, Luma luma, Chroma chroma) {
    const int w = c.width, cw = w / 2, ch = h / 2;
    for (int y = 0; y < h; ++y)
        for (int x = 0; x < w; ++x)
            luma(x, y, static_cast<uint8_t*>(planes.y) + y * planes.ystride + x, y * w + x);
    for (int y = 0; y < ch; ++y) {
        for (int x = 0; x < cw; ++x) {
            size_t at = y * planes.cstride + x * planes.chroma_step;
            // Compact: NV21 V,U pairs, NV12 U,V pairs, YV12 a V plane then a U plane.
            size_t pair = w * h + (y * cw + x) * 2;
            size_t u = c.fourcc == VC_FORMAT_NV21   ? pair + 1
                       : c.fourcc == VC_FORMAT_NV12 ? pair
                                                    : w * h + cw * ch + y * cw + x;
            size_t v = c.fourcc == VC_FORMAT_NV21   ? pair
                       : c.fourcc == VC_FORMAT_NV12 ? pair + 1
                                                    : w * h + y * cw + x;
            chroma(x, y, static_cast<uint8_t*>(planes.cb) + at,
                   static_cast<uint8_t*>(planes.cr) + at, u, v);
        }
    }
}

TEST_P(GraphicBufferYuvTest, CrossesAsFullRangeRgbaBothWays) {
    const YuvCase c = GetParam();
    const int w = c.width, h = 4;
    Seam::allowSharedStorage(c.shared);
    sp<GraphicBuffer> buffer =
        new GraphicBuffer(w, h, c.format, kTextureUsage, (uint32_t)c.stride, "t");
    GlBufferView view(display(), buffer);
    ASSERT_TRUE(view.ok());
    android_ycbcr planes;
    ASSERT_EQ(buffer->lockYCbCr(kWrite, &planes), android::NO_ERROR);
    std::vector<uint8_t> compact(w * h * 3 / 2);
    forPlanes(
        c, h, planes,
        [&](int x, int y, uint8_t* p, size_t at) {
            *p = compact[at] = (uint8_t)(16 + x * 7 + y * 29);
        },
        [&](int x, int y, uint8_t* u, uint8_t* v, size_t uAt, size_t vAt) {
            *u = compact[uAt] = (uint8_t)(40 + x * 50 + y * 9);
            *v = compact[vAt] = (uint8_t)(230 - x * 45 - y * 11);
        });
    ASSERT_EQ(buffer->unlock(), android::NO_ERROR);
    EXPECT_EQ(view.pixels(), converted(compact.data(), w, h, c.fourcc, VC_FORMAT_RGBA));
    // The CPU copy is the original, not the (lossy) RGBA mirror.
    ASSERT_EQ(buffer->lockYCbCr(kRead, &planes), android::NO_ERROR);
    EXPECT_EQ(*(static_cast<uint8_t*>(planes.y) + planes.ystride + 1), 16 + 7 + 29);
    EXPECT_EQ(buffer->unlock(), android::NO_ERROR);

    // Rendered RGBA comes back converted, into the padded rows.
    sp<GraphicBuffer> target =
        new GraphicBuffer(w, h, c.format, kRenderUsage, (uint32_t)c.stride, "t");
    GlBufferView targetView(display(), target);
    ASSERT_TRUE(targetView.ok());
    targetView.bind();
    GlTest_fillHalves(w, h);
    std::vector<uint8_t> expected =
        converted(GlTest_readPixels(w, h).data(), w, h, VC_FORMAT_RGBA, c.fourcc);
    ASSERT_EQ(target->lockYCbCr(kRead, &planes), android::NO_ERROR);
    std::vector<uint8_t> back(expected.size());
    forPlanes(
        c, h, planes, [&](int, int, uint8_t* p, size_t at) { back[at] = *p; },
        [&](int, int, uint8_t* u, uint8_t* v, size_t uAt, size_t vAt) {
            back[uAt] = *u;
            back[vAt] = *v;
        });
    EXPECT_EQ(target->unlock(), android::NO_ERROR);
    EXPECT_EQ(back, expected);
    EXPECT_FALSE(Seam::sharesGpuStorage(target));
}

std::vector<YuvCase> yuvCases() {
    std::vector<YuvCase> cases;
    const std::pair<int, uint32_t> formats[] = {
        {HAL_PIXEL_FORMAT_YCrCb_420_SP, VC_FORMAT_NV21},
        {HAL_PIXEL_FORMAT_VENDOR_YCbCr_420_SP, VC_FORMAT_NV12},
        {HAL_PIXEL_FORMAT_YV12, VC_FORMAT_YV12}};
    for (const auto& f : formats)
        for (int w : {8, 16})
            for (int pad : {0, 2})
                for (bool shared : {true, false})
                    cases.push_back({f.first, f.second, w, w + pad, shared});
    return cases;
}

INSTANTIATE_TEST_SUITE_P(Layouts, GraphicBufferYuvTest, ::testing::ValuesIn(yuvCases()));

TEST_F(GraphicBufferSyncTest, GpuRenderingReachesTheCpuOnTheRenderingThread) {
    const int w = 8, h = 6;
    sp<GraphicBuffer> buffer =
        new GraphicBuffer(w, h, HAL_PIXEL_FORMAT_RGBA_8888, kRenderUsage, 12u, "t");
    GlBufferView view(display(), buffer);
    ASSERT_TRUE(view.ok());
    view.bind();
    GlTest_fillHalves(w, h);
    // No flush here: the lock fences the current context itself.
    uint8_t* pixels = lock(buffer, kRead);
    ASSERT_NE(pixels, nullptr);
    expectHalves(pixels, w, h, 12 * 4);
    EXPECT_EQ(buffer->unlock(), android::NO_ERROR);
    // The caller's context and framebuffer binding are as they were.
    EXPECT_EQ(eglGetCurrentContext(), mGl->env()->getEGLContext());
    glClearColor(0.0f, 1.0f, 0.0f, 1.0f);
    glClear(GL_COLOR_BUFFER_BIT);
    EXPECT_EQ(cpuBytes(buffer, 2), (std::vector<uint8_t>{0, 255}));

    // A change through a read-write lock goes back up.
    pixels = lock(buffer, kRead | kWrite);
    ASSERT_NE(pixels, nullptr);
    pixels[0] = 99;
    EXPECT_EQ(buffer->unlock(), android::NO_ERROR);
    view.bind();
    EXPECT_EQ(GlTest_readPixels(1, 1)[0], 99);
}

// 16 RGBA pixels make a row exactly as long as Mesa's texture rows: such a
// buffer's CPU pixels are the GPU's storage, and nothing is ever copied.
TEST_F(GraphicBufferSyncTest, RgbaRowsLaidOutAsTheDriversShareOneStorage) {
    const int w = 16, h = 6;
    sp<GraphicBuffer> buffer = new GraphicBuffer(w, h, HAL_PIXEL_FORMAT_RGBA_8888, kRenderUsage);
    uint8_t* pixels = lock(buffer, kWrite);
    ASSERT_NE(pixels, nullptr);
    std::vector<uint8_t> pattern(w * h * 4);
    for (size_t i = 0; i < pattern.size(); ++i) pattern[i] = static_cast<uint8_t>(i * 7 + 3);
    memcpy(pixels, pattern.data(), pattern.size());
    ASSERT_EQ(buffer->unlock(), android::NO_ERROR);

    GlBufferView view(display(), buffer);
    ASSERT_TRUE(view.ok());
    EXPECT_TRUE(Seam::sharesGpuStorage(buffer));
    view.bind();
    EXPECT_EQ(GlTest_readPixels(w, h), pattern);  // written before the image existed

    // A CPU write shows at once; the same memory comes back on every lock.
    uint8_t* again = lock(buffer, kWrite);
    ASSERT_EQ(again, pixels);
    memset(again, 0x44, pattern.size());
    ASSERT_EQ(buffer->unlock(), android::NO_ERROR);
    view.bind();
    EXPECT_EQ(GlTest_readPixels(w, h), std::vector<uint8_t>(pattern.size(), 0x44));

    // Rendering, not flushed: the lock waits for it.
    view.bind();
    GlTest_fillHalves(w, h);
    pixels = lock(buffer, kRead);
    ASSERT_NE(pixels, nullptr);
    expectHalves(pixels, w, h, w * 4);
    EXPECT_EQ(buffer->unlock(), android::NO_ERROR);

    // Rows padded differently (10 pixels) keep a copy on each side.
    sp<GraphicBuffer> narrow = new GraphicBuffer(10, 4, HAL_PIXEL_FORMAT_RGBA_8888, kRenderUsage);
    GlBufferView narrowView(display(), narrow);
    ASSERT_TRUE(narrowView.ok());
    EXPECT_FALSE(Seam::sharesGpuStorage(narrow));
}

// A streamed picture's bands taking turns in a ring of two: through every
// band the GPU sees what the CPU wrote there (and the CPU what the GPU drew),
// the band before keeps its rows, and the band that handed its memory on
// reads as zeros on both sides. Sizes whose bands are not whole pages have
// no ring.
TEST_F(GraphicBufferSyncTest, SharedPictureBandsTakeTurnsInARing) {
    const int w = 64, bandRows = 64, bands = 5, h = bandRows * bands - 8;
    std::unique_ptr<EglSharedPicture> picture = EglNativeSeam::get().createSharedPicture(w, h);
    ASSERT_NE(picture, nullptr);
    EXPECT_FALSE(picture->takeBand(0));
    EXPECT_FALSE(picture->useBandRing(3, 2));
    ASSERT_TRUE(picture->useBandRing(bandRows, 2));
    GlTarget target;
    ASSERT_TRUE(GlTest_makeTarget(1, 1, &target));
    glFramebufferTexture2D(GL_FRAMEBUFFER, GL_COLOR_ATTACHMENT0, GL_TEXTURE_2D, picture->texture(),
                           0);
    ASSERT_EQ(glCheckFramebufferStatus(GL_FRAMEBUFFER), (GLenum)GL_FRAMEBUFFER_COMPLETE);
    const size_t rowBytes = w * 4;
    auto rowsIn = [&](int band) { return std::min(bandRows, h - band * bandRows); };
    // What the CPU writes into a band (zeros for -1).
    auto pattern = [&](int band, int seed) {
        std::vector<uint8_t> pixels(rowsIn(band) * rowBytes);
        for (size_t i = 0; seed >= 0 && i < pixels.size(); ++i)
            pixels[i] = (uint8_t)(seed + i / rowBytes * 3 + i % 7);
        return pixels;
    };
    auto slice = [&](const std::vector<uint8_t>& picture, int band) {
        auto first = picture.begin() + band * bandRows * rowBytes;
        return std::vector<uint8_t>(first, first + rowsIn(band) * rowBytes);
    };
    auto cpuRows = [&](int band) {
        std::vector<uint8_t> got;
        for (int y = band * bandRows; y < band * bandRows + rowsIn(band); ++y)
            got.insert(got.end(), picture->row(y), picture->row(y) + rowBytes);
        return got;
    };
    for (int band = 0; band < bands; ++band) {
        ASSERT_TRUE(picture->takeBand(band)) << band;
        const std::vector<uint8_t> rows = pattern(band, band * 40);
        for (int y = 0; y < rowsIn(band); ++y)
            memcpy(picture->row(band * bandRows + y), &rows[y * rowBytes], rowBytes);
        const std::vector<uint8_t> seen = GlTest_readPixels(w, h);
        EXPECT_EQ(slice(seen, band), rows) << band;
        if (band < 1) continue;
        EXPECT_EQ(slice(seen, band - 1), pattern(band - 1, (band - 1) * 40)) << band;
        if (band < 2) continue;
        EXPECT_EQ(slice(seen, band - 2), pattern(band - 2, -1)) << band;
        EXPECT_EQ(cpuRows(band - 2), pattern(band - 2, -1)) << band;
    }
    // The GPU's rendering into the last band reaches the CPU.
    glEnable(GL_SCISSOR_TEST);
    glScissor(0, (bands - 1) * bandRows, w, h - (bands - 1) * bandRows);
    glClearColor(1, 0, 0, 1);
    glClear(GL_COLOR_BUFFER_BIT);
    glDisable(GL_SCISSOR_TEST);
    glFinish();
    std::vector<uint8_t> red(rowsIn(bands - 1) * rowBytes);
    for (size_t i = 0; i < red.size(); ++i) red[i] = i % 4 == 0 || i % 4 == 3 ? 255 : 0;
    EXPECT_EQ(cpuRows(bands - 1), red);
    EXPECT_EQ(glGetError(), (GLenum)GL_NO_ERROR);
    GlTest_deleteTarget(&target);
    picture.reset();
}

// Work flushed by one thread is complete for a lock on another thread without
// a context: read back through a borrowed context (given back after), or, for
// shared storage, waited for even when the lock comes long before the
// rasterizer could have finished a picture this big. Rendered before the
// image went away, a copied buffer is still read back on the next lock.
class GraphicBufferThreadTest : public GraphicBufferSyncTest,
                                public ::testing::WithParamInterface<int> {};

TEST_P(GraphicBufferThreadTest, FlushedRenderingReachesALockOnAnotherThread) {
    const int w = GetParam(), h = GetParam() == 10 ? 8 : w;
    sp<GraphicBuffer> buffer = new GraphicBuffer(w, h, HAL_PIXEL_FORMAT_RGBA_8888, kRenderUsage);
    std::vector<uint8_t> column;  // the last pixel of every row
    EGLContext threadContext = EGL_NO_CONTEXT;
    {
        GlBufferView view(display(), buffer);
        ASSERT_TRUE(view.ok());
        EXPECT_EQ(w % 16 == 0, Seam::sharesGpuStorage(buffer));
        view.bind();
        GlTest_fillHalves(w, h);
        glFlush();  // the hand-over to another thread, as on a device
        std::thread reader([&] {
            void* address = nullptr;
            if (buffer->lock(kRead, &address) != android::NO_ERROR) return;
            const uint8_t* p = static_cast<const uint8_t*>(address);
            for (int y = 0; y < h; ++y)
                column.insert(column.end(), p + (y * w + w - 1) * 4, p + (y * w + w) * 4);
            buffer->unlock();
            threadContext = eglGetCurrentContext();
        });
        reader.join();
    }
    ASSERT_EQ(column.size(), size_t(h) * 4);
    expectHalves(column.data(), 1, h, 4);
    EXPECT_EQ(threadContext, EGL_NO_CONTEXT);
}

INSTANTIATE_TEST_SUITE_P(CopiedAndShared, GraphicBufferThreadTest, ::testing::Values(10, 2048));

TEST_F(GraphicBufferSyncTest, BufferOutlivesTheEnvironmentThatTerminatedTheDisplay) {
    const int w = 4, h = 4;
    sp<GraphicBuffer> buffer = new GraphicBuffer(w, h, HAL_PIXEL_FORMAT_RGBA_8888, kTextureUsage);
    ASSERT_NE(nullptr, fillCpu(buffer, 77, w * h * 4));
    {
        GlBufferView view(display(), buffer);  // makes the mirror
        ASSERT_TRUE(view.ok());
    }
    // The fixture's environment ends (eglTerminate); the host context holds
    // its own reference on the display, so the mirror survives.
    EGLDisplay first = display();
    mGl->release();
    EXPECT_NE(eglQueryString(first, EGL_VENDOR), nullptr);  // still initialised
    GlContext again;
    ASSERT_TRUE(again.ok());
    GlBufferView view(again.env()->getEGLDisplay(), buffer);
    ASSERT_TRUE(view.ok());
    view.bind();
    EXPECT_EQ(GlTest_readPixels(w, h), std::vector<uint8_t>(w * h * 4, 77));
}

TEST(HostEglDisplayTest, TerminationEndsTheDisplayOnlyWithItsLastUser) {
    GlContext first;
    ASSERT_TRUE(first.ok());
    EGLDisplay display = first.env()->getEGLDisplay();
    {
        GlContext second;  // its own eglInitialize on the same display
        ASSERT_TRUE(second.ok());
        ASSERT_EQ(second.env()->getEGLDisplay(), display);
        second.release();  // its eglTerminate
    }
    // The first environment's context still renders.
    ASSERT_EQ(first.surface()->bindSurface(), 0);  // the second one unbound this thread
    GlTarget target;
    ASSERT_TRUE(GlTest_makeTarget(2, 2, &target));
    glClearColor(0.0f, 1.0f, 0.0f, 1.0f);
    glClear(GL_COLOR_BUFFER_BIT);
    EXPECT_EQ(GlTest_readPixels(2, 2)[1], 255);
    GlTest_deleteTarget(&target);
    EXPECT_NE(eglQueryString(display, EGL_VENDOR), nullptr);
    first.release();
    EXPECT_EQ(eglQueryString(display, EGL_VENDOR), nullptr);  // the last reference ends it
}

}  // namespace
