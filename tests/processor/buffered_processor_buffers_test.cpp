// The buffered processor keeps no buffers between calls: each call creates
// its own source and target GraphicBuffers (and says so) and gets its own
// picture back, even where the host recycles buffer memory.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "core/VFilterBufferedProcessorImpl.h"
#include "support/log_capture.h"
#include "vccore/vc_image.h"

namespace {

TEST(BufferedProcessorBuffers, EveryCallHasItsOwnBuffersAndPictureAcrossSizesAndFormats) {
    auto* processor = static_cast<VFilterBufferedProcessorImpl*>(BufferedProcessor_Create());
    ASSERT_EQ(processor->initialize(), 0);
    processor->setEffect(400);
    auto pattern = [](int w, int h, int seed) {
        std::vector<uint8_t> p(size_t(w) * h * 4);
        for (size_t i = 0; i < p.size(); ++i) p[i] = i % 4 == 3 ? 255 : uint8_t(i * 7 + seed * 31);
        return p;
    };
    auto passThrough = [&](const std::vector<uint8_t>& in, int w, int h) {
        std::vector<uint8_t> out(in.size(), 0);
        EXPECT_EQ(processor->doProcessRGBA(in.data(), w, h, out.data(), VC_FORMAT_RGBA), 0);
        return out;
    };
    // Nothing of an earlier call may show, whatever the sizes in between.
    const int sizes[][2] = {{16, 8}, {16, 8}, {10, 4}, {16, 8}};
    int seed = 0;
    LogCapture log;
    for (const auto& s : sizes) {
        std::vector<uint8_t> in = pattern(s[0], s[1], ++seed);
        EXPECT_EQ(passThrough(in, s[0], s[1]), in) << s[0] << "x" << s[1] << " seed " << seed;
    }
    for (const char* size : {"16x8", "10x4"}) {
        const size_t calls = std::string(size) == "16x8" ? 3 : 1;
        const std::string head = std::string("EglImage: Creating GraphicBuffer ") + size;
        EXPECT_EQ(log.count(head + " RGBA (format 1, usage 0x00000133)"), calls);  // sources
        EXPECT_EQ(log.count(head + " RGBA (format 1, usage 0x00000333)"), calls);  // targets
    }
    // NV21 of the same size between two RGBA calls: the source's format changes twice.
    const int w = 16, h = 8;
    std::vector<uint8_t> nv21(w * h * 3 / 2, 128), out(w * h * 4, 0);
    for (int i = 0; i < w * h; ++i) nv21[i] = uint8_t(40 + i);
    ASSERT_EQ(processor->doProcessNV21(nv21.data(), w, h, out.data()), 0);
    // Neutral chroma: every channel is the luma (full range).
    for (int i = 0; i < w * h; ++i) EXPECT_NEAR(out[i * 4], nv21[i], 2) << i;
    std::vector<uint8_t> in = pattern(w, h, ++seed);
    EXPECT_EQ(passThrough(in, w, h), in);
    processor->release();
    BufferedProcessor_Destroy(processor);
}

}  // namespace
