// The buffered processor keeps no buffers between calls: each call creates
// its own source and target GraphicBuffers (and says so), and a run of calls
// of one size still gives each call its own picture.
#include <gtest/gtest.h>

#include <vector>

#include "core/VFilterBufferedProcessorImpl.h"
#include "support/log_capture.h"
#include "vccore/vc_image.h"

namespace {

TEST(BufferedProcessorBuffers, EveryCallCreatesItsOwnSourceAndTarget) {
    auto* processor = static_cast<VFilterBufferedProcessorImpl*>(BufferedProcessor_Create());
    ASSERT_EQ(processor->initialize(), 0);
    processor->setEffect(400);
    const int w = 8, h = 6, calls = 3;
    LogCapture log;
    for (int call = 0; call < calls; ++call) {
        std::vector<uint8_t> in(w * h * 4), out(in.size(), 0);
        for (size_t i = 0; i < in.size(); ++i)
            in[i] = i % 4 == 3 ? 255 : uint8_t(i * 5 + call * 77);
        ASSERT_EQ(processor->doProcessRGBA(in.data(), w, h, out.data(), VC_FORMAT_RGBA), 0);
        EXPECT_EQ(out, in) << "call " << call;
    }
    EXPECT_EQ(log.count("EglImage: Creating GraphicBuffer 8x6 RGBA (format 1, usage 0x00000133)"),
              size_t(calls));  // sources
    EXPECT_EQ(log.count("EglImage: Creating GraphicBuffer 8x6 RGBA (format 1, usage 0x00000333)"),
              size_t(calls));  // targets
    processor->release();
    BufferedProcessor_Destroy(processor);
}

}  // namespace
