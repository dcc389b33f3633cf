// kiv-test-labels: threads
// Both converters against the image core's own conversion, byte for byte; the
// external converter's cases run in their own processes (see
// tests/vccore/csc_standin/CMakeLists.txt) with KIV_CSC_STANDIN set.
#include "core/egl/AsyncImageConverter.h"

#include <gtest/gtest.h>
#include <stdlib.h>
#include <string.h>

#include <atomic>
#include <string>
#include <thread>
#include <tuple>
#include <vector>

#include "support/frame_collector.h"
#include "support/log_capture.h"
#include "support/image_ptr.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_log.h"

using android::sp;

namespace {

const uint32_t kFormats[] = {VC_FORMAT_RGBA, VC_FORMAT_BGRA, VC_FORMAT_ARGB, VC_FORMAT_ABGR,
                             VC_FORMAT_RGB8, VC_FORMAT_BGR8, VC_FORMAT_GREY, VC_FORMAT_YUYV,
                             VC_FORMAT_YVYU, VC_FORMAT_NV12, VC_FORMAT_NV21, VC_FORMAT_YV12,
                             VC_FORMAT_YUVP};

struct Size {
    int width, height;
};
// Four bands, two bands, no bands, one row, odd both ways.
const Size kSizes[] = {{64, 48}, {64, 52}, {64, 50}, {64, 1}, {63, 7}};

// Test access to the converter's queue, to stop it from outside.
class StoppableConverter : public AsyncImageConverter {
public:
    StoppableConverter() : AsyncImageConverter(1) {}
    void stop() { mWorkQueue.cancel(); }
};

// What the image core makes of source in format: its status, its bytes, and
// which of them it defines (a grey source leaves part of a YUV target's chroma
// as the buffer had it): converted twice, into zeros and into ones.
struct Expected {
    int status;
    std::vector<uint8_t> bytes;
    std::vector<bool> defined;
};
Expected cpuConversion(const VCImage& source, uint32_t format) {
    ImagePtr zeros(VCImage_createNew(source.width, source.height, format));
    ImagePtr ones(VCImage_createNew(source.width, source.height, format));
    memset(zeros->data, 0, zeros->size);
    memset(ones->data, 0xFF, ones->size);
    Expected e{VCImage_convert(&source, zeros.get()), {}, {}};
    if (e.status < 0 || VCImage_convert(&source, ones.get()) < 0) return e;
    e.bytes = VCImageTest_bytes(*zeros);
    for (uint32_t i = 0; i < zeros->size; ++i) e.defined.push_back(zeros->data[i] == ones->data[i]);
    return e;
}

// Whether a frame has the expected bytes wherever the conversion defines them.
testing::AssertionResult sameBytes(const Expected& want, const std::vector<uint8_t>& got) {
    if (got.size() != want.bytes.size())
        return testing::AssertionFailure() << got.size() << " bytes, want " << want.bytes.size();
    for (size_t i = 0; i < got.size(); ++i)
        if (want.defined[i] && got[i] != want.bytes[i])
            return testing::AssertionFailure()
                   << "byte " << i << ": " << int(got[i]) << ", want " << int(want.bytes[i]);
    return testing::AssertionSuccess();
}

// Posts source to a fresh one-thread asynchronous converter and waits for it
// by dropping the converter (which delivers what it accepted). Without
// ownership the caller's image is scribbled over at once: the job must have
// taken its own copy.
int postAsync(VCImage* source, FrameCollector& listener, nsecs_t timestamp, bool take) {
    sp<AsyncImageConverter> converter = new AsyncImageConverter(1);
    int status = converter->convertAndPost(source, listener, timestamp, take);
    if (!take && source != nullptr && source->data != nullptr)
        memset(source->data, 0xA5, VCImage_size(source));
    converter.clear();
    return status;
}

struct Frame {
    int width, height;
    uint32_t from, to;
};

// A random frame through a fresh asynchronous converter: one frame posted,
// equal to the image core's conversion wherever that defines the bytes.
testing::AssertionResult postedAsTheImageCore(const Frame& f, uint32_t seed, bool take) {
    ImagePtr source = VCImageTest_random(f.width, f.height, f.from, seed);
    const Expected want = cpuConversion(*source, f.to);
    if (want.status != 0) return testing::AssertionFailure() << "image core: " << want.status;
    FrameCollector listener(f.to);
    const int status = postAsync(take ? source.release() : source.get(), listener, seed, take);
    if (status != 0 || listener.frames().size() != 1)
        return testing::AssertionFailure()
               << "status " << status << ", " << listener.frames().size() << " frames";
    return sameBytes(want, listener.frames()[0].bytes);
}

class ConverterPairs : public ::testing::TestWithParam<std::tuple<uint32_t, uint32_t>> {};

TEST_P(ConverterPairs, MatchTheImageCoreByteForByte) {
    const uint32_t from = std::get<0>(GetParam()), to = std::get<1>(GetParam());
    LogCapture quiet;
    sp<SyncImageConverter> sync = new SyncImageConverter;
    int n = 0;
    for (const Size& s : kSizes) {
        SCOPED_TRACE(testing::Message() << s.width << "x" << s.height);
        ImagePtr source = VCImageTest_random(s.width, s.height, from, n * 131 + from);
        ASSERT_NE(nullptr, source);
        const std::vector<uint8_t> original = VCImageTest_bytes(*source);
        const Expected want = cpuConversion(*source, to);

        // Synchronous: one converter reused over growing and shrinking frames.
        FrameCollector syncListener(to);
        EXPECT_EQ(want.status < 0 ? want.status : 0,
                  sync->convertAndPost(source.get(), syncListener, n, false));
        std::vector<CollectedFrame> frames = syncListener.frames();
        ASSERT_EQ(want.status < 0 ? 0u : 1u, frames.size());
        if (!frames.empty()) {
            EXPECT_TRUE(sameBytes(want, frames[0].bytes));
            EXPECT_EQ(to, frames[0].format);
            EXPECT_TRUE(pthread_equal(pthread_self(), frames[0].thread));
        }
        EXPECT_EQ(original, VCImageTest_bytes(*source));

        // Asynchronous, taking ownership every other size. A frame already in
        // the wanted format is passed through, even where converting refuses it.
        const bool take = n % 2 == 0;
        FrameCollector asyncListener(to);
        VCImage* given = take ? source.release() : source.get();
        ASSERT_EQ(0, postAsync(given, asyncListener, 1000 + n, take));
        frames = asyncListener.frames();
        const std::vector<CollectedError> errors = asyncListener.errors();
        if (from == to || want.status >= 0) {
            ASSERT_EQ(1u, frames.size());
            EXPECT_TRUE(errors.empty());
            if (from == to)
                EXPECT_EQ(original, frames[0].bytes);
            else
                EXPECT_TRUE(sameBytes(want, frames[0].bytes));
            EXPECT_EQ(to, frames[0].format);
            EXPECT_EQ(s.width, frames[0].width);
            EXPECT_EQ(s.height, frames[0].height);
            EXPECT_EQ(1000 + n, frames[0].timestamp);
            EXPECT_FALSE(pthread_equal(pthread_self(), frames[0].thread));
        } else {
            EXPECT_TRUE(frames.empty());
            ASSERT_EQ(1u, errors.size());
            EXPECT_EQ(want.status, errors[0].code);
            EXPECT_EQ("Image conversion failed", errors[0].message);
        }
        ++n;
    }
}

INSTANTIATE_TEST_SUITE_P(AllFormats, ConverterPairs,
                         testing::Combine(testing::ValuesIn(kFormats), testing::ValuesIn(kFormats)),
                         VCImageTest_pairName);

// Frames large enough for their bands to be taken a chunk of rows at a time,
// with a shorter last chunk: four bands (height a multiple of 8) and two.
TEST(AsyncImageConverter, ChunkedBandsMatchTheImageCore) {
    LogCapture log;
    const Frame frames[] = {{2048, 2104, VC_FORMAT_RGBA, VC_FORMAT_NV21},
                            {2048, 2104, VC_FORMAT_RGB8, VC_FORMAT_YUYV},
                            {2048, 2092, VC_FORMAT_NV21, VC_FORMAT_RGBA},
                            {2048, 2092, VC_FORMAT_NV12, VC_FORMAT_BGR8}};
    int n = 0;
    for (const Frame& f : frames) {
        SCOPED_TRACE(n);
        const int bandRows = f.height / AsyncImageConverter::ConvertJob::sliceCount(f.height);
        ASSERT_LT(AsyncImageConverter::ConvertJob::chunkRows(bandRows, f.width, f.from, f.to),
                  bandRows);
        log.clear();
        EXPECT_TRUE(postedAsTheImageCore(f, 300 + n++, true));
        // By the bands, not by the whole-frame fallback.
        EXPECT_EQ(1u, log.countPrefix("[Async/Slices] Time to convert"));
    }
}

TEST(AsyncImageConverter, SliceCountFollowsTheHeight) {
    const int table[][2] = {{720, 4}, {740, 2}, {738, 0}, {3000, 4}, {1084, 2}, {8, 4},
                            {4, 2},   {2, 0},   {1, 0},   {0, 0},    {-8, 0}};
    for (const auto& row : table)
        EXPECT_EQ(row[1], AsyncImageConverter::ConvertJob::sliceCount(row[0])) << row[0];
}

// Every log line and status of the converters, one scenario a row.
TEST(ImageConverters, LogLinesAndStatuses) {
    const std::string kNull = "VC_ERROR_NULL_PARAM (-2): core/egl/AsyncImageConverter:";
    const std::string kJob = "int AsyncImageConverter::ConvertJob::doConversion(): ";
    const uint32_t R = VC_FORMAT_RGBA, N = VC_FORMAT_NV21;
    struct Row {
        bool async;
        int width, height;
        uint32_t from, to;  // from 0: a null image; to 0: a listener wanting no known format
        int status, listenerError;  // of convertAndPost, and as the listener is told (0: none)
        int level;                  // of the line, or -1 when it ends in a number
        std::string line;
        bool posted;
    };
    const std::vector<Row> rows = {
        {false, 8, 8, 0, N, -2, 0, -1, kNull, false},
        {true, 8, 8, 0, N, -2, 0, -1, kNull, false},
        {false, 64, 48, R, N, 0, 0, 3, "Converting frame synchronously RGBA --> NV21, TS = 77",
         true},
        {false, 64, 48, R, N, 0, 0, -1, "[Sync] Time to convert RGBA --> NV21: ", true},
        {false, 64, 48, N, N, 0, 0, -1, "[Sync] Time to convert NV21 --> NV21: ", true},
        {false, 64, 48, R, 0, -3, 0, 4, "Failed to allocate image for color conversion: -3", false},
        {false, 63, 8, R, N, -4, 0, 4, "Color conversion failed: -4", false},
        {true, 64, 48, R, N, 0, 0, -1, "[Async/Slices] Time to convert RGBA --> NV21: ", true},
        {true, 64, 50, R, N, 0, 0, -1, "[Async] Time to convert RGBA --> NV21: ", true},
        {true, 64, 50, N, N, 0, 0, 1, "Directly passing image 64x50 NV21 to listener...", true},
        {true, 64, 48, R, 0, 0, -3, 4, kJob + "Allocation failed.", false},
        // Bands that fail leave the frame to the plain path, which reports it.
        {true, 63, 8, R, N, 0, -4, 4, kJob + "Conversion failed.", false},
        // A stopped queue refuses the frame (-38 from the queue).
        {true, 64, 48, R, N, -38, 0, 4,
         "EGL: Work queue failed [virtual int AsyncImageConverter::convertAndPost(VCImage*, "
         "OnFrameListener&, nsecs_t, bool)]: -38",
         false},
    };
    for (size_t i = 0; i < rows.size(); ++i) {
        const Row& row = rows[i];
        SCOPED_TRACE(row.line);
        LogCapture log;
        FrameCollector listener(row.to);
        VCImage* image =
            row.from ? VCImageTest_random(row.width, row.height, row.from, 5).release() : nullptr;
        sp<ImageConverter> converter;
        if (row.async) {
            sp<StoppableConverter> async = new StoppableConverter;
            if (row.status == -38) async->stop();
            converter = async;
        } else {
            converter = new SyncImageConverter;
        }
        EXPECT_EQ(row.status, converter->convertAndPost(image, listener, 77, true));
        converter.clear();
        const std::vector<CollectedError> errors = listener.errors();
        ASSERT_EQ(row.listenerError ? 1u : 0u, errors.size());
        if (row.listenerError) {
            EXPECT_EQ(row.listenerError, errors[0].code);
            EXPECT_EQ("Image conversion failed", errors[0].message);
        }
        EXPECT_EQ(row.posted ? 1u : 0u, listener.frames().size());
        if (row.level < 0)
            EXPECT_EQ(1u, log.countPrefix(row.line));
        else
            EXPECT_TRUE(log.contains(row.level, row.line));
    }
}

TEST(AsyncImageConverter, FramesArriveInOrderOnTheWorker) {
    LogCapture quiet;
    FrameCollector listener(VC_FORMAT_RGBA);
    sp<AsyncImageConverter> converter = new AsyncImageConverter(1);
    const int kFrames = 24;
    for (int i = 0; i < kFrames; ++i) {
        ImagePtr image = VCImageTest_random(32, 16 + 4 * (i % 3), VC_FORMAT_NV21, i);
        ASSERT_EQ(0, converter->convertAndPost(image.get(), listener, i, false));
    }
    ASSERT_TRUE(listener.waitFor(kFrames));
    std::vector<CollectedFrame> frames = listener.frames();
    ASSERT_EQ(static_cast<size_t>(kFrames), frames.size());
    for (int i = 0; i < kFrames; ++i) {
        EXPECT_EQ(i, frames[i].timestamp);
        EXPECT_TRUE(pthread_equal(frames[0].thread, frames[i].thread));
        EXPECT_FALSE(pthread_equal(pthread_self(), frames[i].thread));
    }
}

// Thousands of frames through both converters and both ownership modes, some
// failing, some null, from several producers at once: every call ends in one
// frame, one listener error or one refused status, and ASan sees no leak.
TEST(ImageConverters, EveryFrameIsAccountedForAndFreed) {
    LogCapture quiet;
    FrameCollector good(VC_FORMAT_NV21), through(VC_FORMAT_RGBA), failing(0);
    FrameCollector* listeners[] = {&good, &through, &failing};
    sp<AsyncImageConverter> async = new AsyncImageConverter(1);
    sp<SyncImageConverter> sync = new SyncImageConverter;
    const int kProducers = 3, kPerProducer = 700;
    std::atomic<int> refused{0}, syncFailed{0}, syncPosted{0};
    std::vector<std::thread> producers;
    for (int p = 0; p < kProducers; ++p)
        producers.emplace_back([&, p] {
            for (int i = 0; i < kPerProducer; ++i) {
                const int k = p * kPerProducer + i;
                FrameCollector& listener = *listeners[k % 3];
                const bool take = (k / 3) % 2 == 0;
                ImagePtr image = k % 50 == 49
                                     ? nullptr
                                     : VCImageTest_random(16, 8 + 4 * (k % 2), VC_FORMAT_RGBA, k);
                VCImage* given = take ? image.release() : image.get();
                int status;
                if (k % 7 == 0) {
                    status = sync->convertAndPost(given, listener, k, take);
                    (status == 0 ? syncPosted : syncFailed)++;
                } else {
                    status = async->convertAndPost(given, listener, k, take);
                    if (status != 0) refused++;
                }
            }
        });
    for (std::thread& t : producers) t.join();
    async.clear();
    size_t delivered = 0;
    for (FrameCollector* l : listeners) delivered += l->frames().size() + l->errors().size();
    // Synchronous frames are among the delivered ones; synchronous failures
    // and refusals are only told by their status.
    EXPECT_EQ(static_cast<size_t>(kProducers * kPerProducer),
              delivered + syncFailed.load() + refused.load());
    EXPECT_GT(syncPosted.load(), 0);
    EXPECT_GT(refused.load(), 0);
    for (const CollectedError& e : failing.errors()) EXPECT_EQ(-3, e.code);
    EXPECT_EQ(0u, good.errors().size());
    EXPECT_EQ(0u, through.errors().size());
}

// The optional external converter: tried for each frame while it exists,
// given up for good once it is found missing; frames equal the image core's
// whenever it does not convert.
TEST(ExternalConverter, FallbacksKeepTheFramesExact) {
    const char* env = getenv("KIV_CSC_STANDIN");
    const std::string mode = env != nullptr ? env : "";
    if (mode != "absent" && mode != "present" && mode != "partial")
        GTEST_SKIP() << "runs in its own process per stand-in case";
    LogCapture log;
    FrameCollector rgbaToNv21(VC_FORMAT_NV21);
    // BGRA to NV12 is left out: the libcsc stand-in fills a whole frame (or a
    // band) from its first pixel, so bands and frames differ by design.
    const Frame frames[] = {{64, 48, VC_FORMAT_RGBA, VC_FORMAT_NV21},
                            {64, 52, VC_FORMAT_NV21, VC_FORMAT_RGBA},
                            {64, 50, VC_FORMAT_BGRA, VC_FORMAT_YV12},
                            {13, 8, VC_FORMAT_RGBA, VC_FORMAT_BGRA}};
    int n = 0;
    for (const Frame& f : frames) {
        EXPECT_TRUE(postedAsTheImageCore(f, 40 + n, false)) << n;
        ++n;
    }
    const size_t tried = log.countPrefix("VCConverter_create: ");
    const size_t inits = log.countPrefix("VCConverter: Calling vc_csc_init: ");
    EXPECT_EQ(4u, tried);
    EXPECT_EQ(0u, log.countPrefix("[Async/External]"));
    if (mode == "absent") {
        EXPECT_EQ(1u, log.count("VCConverter: Could not open the dynamic library for CSC."));
        EXPECT_EQ(0u, inits);
    } else if (mode == "partial") {
        EXPECT_EQ(1u, log.count("VCConverter: Could not find some symbols for CSC."));
        EXPECT_EQ(0u, inits);
    } else {
        // Every frame asks; 13 wide is refused by the stand-in, the others
        // answer a non-zero status that counts as a failure.
        EXPECT_EQ(4u, inits);
        EXPECT_EQ(1u, log.count("VCConverter: Could not create this converter."));
        // 24 wide plays a conversion that works: its output is posted as is.
        log.clear();
        ImagePtr source = VCImageTest_random(24, 16, VC_FORMAT_RGBA, 9);
        const uint8_t mark = source->data[0] ^ 0x5A;
        ASSERT_EQ(0, postAsync(source.release(), rgbaToNv21, 5, true));
        ASSERT_EQ(1u, rgbaToNv21.frames().size());
        const std::vector<uint8_t> bytes = rgbaToNv21.frames()[0].bytes;
        ASSERT_EQ(24u * 16 * 3 / 2, bytes.size());
        for (int i = 0; i < 24 * 16; ++i) ASSERT_EQ(mark, bytes[i]) << i;
        EXPECT_EQ(1u, log.countPrefix("[Async/External] Time to convert RGBA --> NV21: "));
    }
}

}  // namespace
