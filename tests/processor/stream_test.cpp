// The streamed path of the buffered processor: every effect the factory
// serves gives, band by band, the very bytes of the whole-picture path.
// kiv-test-labels: threads
#include <gtest/gtest.h>
#include <stdlib.h>

#include <cmath>
#include <functional>
#include <memory>
#include <numeric>
#include <string>
#include <vector>

#include "core/KivBandPipeline.h"
#include "core/KivFilter.h"
#include "core/KivImaging.h"
#include "core/KivPixelReach.h"
#include "core/VFilterBufferedProcessorImpl.h"
#include "core/egl/Platform.h"
#include "core/filters/sce/singleCameraEffects.h"
#include "support/temp_dir.h"
#include "support/test_picture.h"
#include "support/image_ptr.h"
#include "vccore/vc_file.h"
#include "vccore/vc_picture.h"

namespace {

using Bytes = std::vector<unsigned char>;

// Even sizes (NV21 needs them); taller than three 64-row bands.
const int kWidth = 72;
const int kHeight = 210;

// Every id of the built-in ranges that the factory serves.
std::vector<int> factoryIds() {
    std::vector<int> ids;
    for (auto range :
         {std::make_pair(200, 213), std::make_pair(400, 447), std::make_pair(500, 508)}) {
        for (int id = range.first; id <= range.second; ++id) {
            KivFilter* effect = KivImaging_create(id, nullptr);
            if (effect == nullptr) continue;
            if (effect->getFilterType() == id) ids.push_back(id);
            delete effect;
        }
    }
    return ids;
}

// The test picture (gradients, hard-edged blocks the neighbour-reading
// effects pick out), alpha varying for PNG.
ImagePtr photo(int width, int height, bool alpha) {
    std::vector<uint8_t> rgba = kivtest::makeTestPicture(width, height, !alpha);
    ImagePtr image(VCImage_createNew(width, height, VC_FORMAT_RGBA));
    std::copy(rgba.begin(), rgba.end(), image->data);
    return image;
}

Bytes bytesOf(unsigned char* stream, size_t length) {
    Bytes out(stream, stream + length);
    free(stream);
    return out;
}

Bytes jpegOf(int width, int height) {
    ImagePtr jpeg(VCImage_encodeToJpeg(photo(width, height, false).get(), 90));
    return Bytes(jpeg->data, jpeg->data + jpeg->size);
}

const Bytes& jpegInput() {
    static const Bytes bytes = jpegOf(kWidth, kHeight);
    return bytes;
}

const Bytes& pngInput() {
    static const Bytes bytes = [] {
        size_t length = 0;
        unsigned char* png = VCPicture_encodePng(photo(kWidth, kHeight, true).get(), &length);
        return bytesOf(png, length);
    }();
    return bytes;
}

// Effects the streamed path leaves to the whole picture: those that do not
// say what they read, and neighbour-reading ones that draw by themselves
// (their own passes would read rows no pass of the band drew).
bool declines(KivFilter* effect) {
    if (dynamic_cast<KivPixelReachSource*>(effect) == nullptr) return true;
    const KivPixelReach reach = KivFilter_pixelReach(effect, kWidth, kHeight);
    return reach.kind != KivPixelReach::SAME_PIXEL &&
           dynamic_cast<SingleCameraEffects*>(effect) == nullptr;
}

class StreamTest : public ::testing::TestWithParam<int> {
protected:
    static void SetUpTestSuite() {
        sProcessor = new VFilterBufferedProcessorImpl();
        sProcessor->initialize();
        KivBandPipeline::setBandRowsForTesting(64);
    }
    static void TearDownTestSuite() {
        KivBandPipeline::setBandRowsForTesting(0);
        sProcessor->release();
        delete sProcessor;
    }

    // The whole-picture path: decoded into `format`, one draw, encoded. Each
    // path gets the effect fresh: some move on from frame to frame.
    Bytes whole(const Bytes& input, uint32_t format, bool png, int quality) {
        sProcessor->setEffect(GetParam());
        ImagePtr in(VCImage_createEmpty(0, 0, format));
        EXPECT_EQ(0, VCImage_decodeFromJpeg(in.get(), input.data(), (int)input.size()));
        ImagePtr out(VCImage_createNew(in->width, in->height, VC_FORMAT_RGBA));
        const int rc = format == VC_FORMAT_NV21
                           ? sProcessor->doProcessNV21(in->data, in->width, in->height, out->data)
                           : sProcessor->doProcessRGBA(in->data, in->width, in->height, out->data,
                                                       VC_FORMAT_RGBA);
        EXPECT_EQ(0, rc);
        if (png) {
            size_t length = 0;
            unsigned char* stream = VCPicture_encodePng(out.get(), &length);
            return bytesOf(stream, length);
        }
        ImagePtr jpeg(VCImage_encodeToJpeg(out.get(), quality));
        return Bytes(jpeg->data, jpeg->data + jpeg->size);
    }

    Bytes streamed(const Bytes& input, bool nv21, bool png, int quality, int* rc) {
        sProcessor->setEffect(GetParam());
        unsigned char* stream = nullptr;
        size_t length = 0;
        VCDecodeFailure why = VC_DECODE_CORRUPT;
        *rc = sProcessor->processStream(input.data(), input.size(), nv21, {png, quality}, &stream,
                                        &length, &why);
        EXPECT_EQ(VC_DECODE_OK, why);
        return *rc == 0 ? bytesOf(stream, length) : Bytes();
    }

    static VFilterBufferedProcessorImpl* sProcessor;
};

VFilterBufferedProcessorImpl* StreamTest::sProcessor = nullptr;

TEST_P(StreamTest, BandsGiveTheWholePicturesBytes) {
    ASSERT_EQ(0, sProcessor->setEffect(GetParam()));
    struct Case {
        const Bytes& input;
        bool nv21, png;
        int quality;
    } cases[] = {
        {jpegInput(), false, false, 90},  // kivimaging apply
        {jpegInput(), true, false, 98},   // processFile
        {pngInput(), false, true, 0},     // PNG in and out, alpha kept
    };
    for (const Case& c : cases) {
        int rc = -1;
        Bytes band = streamed(c.input, c.nv21, c.png, c.quality, &rc);
        if (rc == VC_ERROR_UNSUPPORTED && declines(sProcessor->getEffect())) return;
        ASSERT_EQ(0, rc) << "nv21 " << c.nv21 << " png " << c.png;
        EXPECT_TRUE(band ==
                    whole(c.input, c.nv21 ? VC_FORMAT_NV21 : VC_FORMAT_RGBA, c.png, c.quality))
            << "nv21 " << c.nv21 << " png " << c.png;
    }
}

// Effects that read rows around their own keep those rows until every band
// that reads them is drawn: rows a page wide, so that a row given back too
// early really reads as zeros.
TEST_P(StreamTest, NeighbourReadingEffectsKeepTheirReach) {
    const int width = 1024, height = 1800;
    ASSERT_EQ(0, sProcessor->setEffect(GetParam()));
    const KivPixelReach reach = KivFilter_pixelReach(sProcessor->getEffect(), width, height);
    if (reach.kind != KivPixelReach::NEIGHBOURS) GTEST_SKIP() << "reads no neighbours";
    EXPECT_GT(reach.haloRows, 0);
    static const Bytes input = jpegOf(width, height);
    int rc = -1;
    Bytes band = streamed(input, false, false, 90, &rc);
    ASSERT_EQ(0, rc);
    EXPECT_TRUE(band == whole(input, VC_FORMAT_RGBA, false, 90));
}

// Pictures larger than a texture (128 here) go in tiles, each drawn as a
// window of the whole picture, for every effect whose reach leaves room in a
// tile; the others keep to the whole-picture path, which refuses them. Reads
// map exactly (sides that fit keep their positions, mapped sides are powers
// of two), but GL interpolates a tile's coordinates from the tile's corners:
// effects that use the position (Vignette, Rainbow, Ripple) may round the
// odd pixel to the next level.
TEST_P(StreamTest, TilesGiveTheUntiledPixels) {
    struct Size {
        int width, height;
    } sizes[] = {{256, 64}, {64, 256}, {200, 150}};
    for (const Size& size : sizes) {
        const Bytes input = jpegOf(size.width, size.height);
        ASSERT_EQ(0, sProcessor->setEffect(GetParam()));
        const KivPixelReach reach =
            KivFilter_pixelReach(sProcessor->getEffect(), size.width, size.height);
        const int rows = reach.kind == KivPixelReach::NEIGHBOURS ? reach.haloRows + 2 : 2;
        const int columns = reach.kind == KivPixelReach::NEIGHBOURS ? reach.haloColumns + 2 : 2;
        const bool tiles = !declines(sProcessor->getEffect()) &&
                           reach.kind != KivPixelReach::WHOLE_PICTURE && 2 * rows < 128 &&
                           (size.width <= 128 || 2 * columns < 128);
        for (bool nv21 : {false, true}) {
            SCOPED_TRACE(testing::Message()
                         << size.width << "x" << size.height << " nv21 " << nv21);
            int rc = -1;
            const Bytes untiled = streamed(input, nv21, true, 0, &rc);
            Platform::setMaximumTextureSizeForTesting(128);
            const Bytes tiled = streamed(input, nv21, true, 0, &rc);
            Platform::resetForTesting();
            ASSERT_EQ(tiles ? 0 : VC_ERROR_UNSUPPORTED, rc);
            if (!tiles) continue;
            if (tiled == untiled) continue;
            ImagePtr a(VCImage_createEmpty(0, 0, VC_FORMAT_RGBA));
            ImagePtr b(VCImage_createEmpty(0, 0, VC_FORMAT_RGBA));
            ASSERT_EQ(0, VCImage_decodeFromJpeg(a.get(), tiled.data(), (int)tiled.size()));
            ASSERT_EQ(0, VCImage_decodeFromJpeg(b.get(), untiled.data(), (int)untiled.size()));
            const std::vector<uint8_t> pa = VCImageTest_bytes(*a), pb = VCImageTest_bytes(*b);
            EXPECT_LE(VCImageTest_maxDifference(pa, pb), 1);
            EXPECT_LE(std::inner_product(pa.begin(), pa.end(), pb.begin(), size_t(0),
                                         std::plus<size_t>(), std::not_equal_to<uint8_t>()),
                      pa.size() / 1000);
        }
    }
}

INSTANTIATE_TEST_SUITE_P(Factory, StreamTest, ::testing::ValuesIn(factoryIds()),
                         [](const ::testing::TestParamInfo<int>& info) {
                             return std::to_string(info.param);
                         });

}  // namespace

namespace {

// What cannot stream says so before anything is drawn; what fails midway
// stops every stage and says why.
TEST(StreamRefusal, StatusAndReason) {
    VFilterBufferedProcessorImpl processor;
    processor.initialize();
    processor.setEffect(401);
    KivBandPipeline::setBandRowsForTesting(64);
    const Bytes jpeg = jpegOf(kWidth, kHeight);
    const Bytes odd = jpegOf(kWidth - 1, kHeight);
    const Bytes truncated(jpeg.begin(), jpeg.begin() + jpeg.size() * 2 / 3);
    const Bytes text = {'n', 'o', 't', ' ', 'a', ' ', 'p', 'i', 'c'};
    struct Row {
        const char* what;
        const Bytes& input;
        bool nv21;
        int maxTexture;  // 0: the GPU's own
        int status;
        VCDecodeFailure why;
    } table[] = {
        {"odd size through NV21", odd, true, 0, VC_ERROR_UNSUPPORTED, VC_DECODE_OK},
        {"odd size as RGBA", odd, false, 0, 0, VC_DECODE_OK},
        {"taller than a texture: tiles", jpeg, false, 128, 0, VC_DECODE_OK},
        {"not a picture", text, false, 0, VC_ERROR_CODEC_FAILED, VC_DECODE_NOT_A_PICTURE},
        {"cut short", truncated, false, 0, VC_ERROR_CODEC_FAILED, VC_DECODE_TRUNCATED},
    };
    for (const Row& row : table) {
        if (row.maxTexture > 0) Platform::setMaximumTextureSizeForTesting(row.maxTexture);
        unsigned char* stream = nullptr;
        size_t length = 0;
        VCDecodeFailure why = VC_DECODE_CORRUPT;
        EXPECT_EQ(row.status, processor.processStream(row.input.data(), row.input.size(), row.nv21,
                                                      {false, 90}, &stream, &length, &why))
            << row.what;
        EXPECT_EQ(row.why, why) << row.what;
        EXPECT_EQ(row.status == 0, stream != nullptr) << row.what;
        free(stream);
        Platform::resetForTesting();
    }
    VCDecodeFailure why;
    unsigned char* stream = nullptr;
    size_t length = 0;
    EXPECT_EQ(VC_ERROR_NULL_PARAM,
              processor.processStream(nullptr, 0, false, {false, 90}, &stream, &length, &why));
    KivBandPipeline::setBandRowsForTesting(0);
    processor.release();
}

}  // namespace

namespace {

// processFile streams a picture into a JPEG output, asks for the output path
// once, and leaves other outputs (and pictures it cannot stream) to the
// whole-picture path: the files are those of load, doProcessNV21 and save.
TEST(StreamFile, ProcessFileWritesTheWholePathsFile) {
    kivtest::TempDir dir;
    VFilterBufferedProcessorImpl processor;
    processor.initialize();
    processor.setEffect(422);
    KivBandPipeline::setBandRowsForTesting(64);
    const std::string even = dir.file("even.jpg"), odd = dir.file("odd.jpg");
    kivtest::writeFile(even, jpegOf(kWidth, kHeight));
    kivtest::writeFile(odd, jpegOf(kWidth - 1, kHeight - 1));
    // Odd sizes do not load as NV21 at all, streamed or not.
    EXPECT_EQ(VFilterBufferedProcessorImpl::FILE_LOAD_FAILED,
              processor.processFilePath(odd.c_str(), [&]() {
                  ADD_FAILURE() << "output asked for";
                  return "never.jpg";
              }));
    for (const char* output : {"out.JPG", "out.png"}) {
        const std::string got = dir.file(output), want = dir.file(std::string("whole_") + output);
        int asked = 0;
        EXPECT_EQ(VFilterBufferedProcessorImpl::FILE_OK,
                  processor.processFilePath(even.c_str(), [&]() {
                      ++asked;
                      return got.c_str();
                  }));
        EXPECT_EQ(1, asked) << output;
        ImagePtr nv21(VCImage_createEmpty(0, 0, VC_FORMAT_NV21));
        ASSERT_EQ(0, VCImage_loadFromFile(nv21.get(), even.c_str()));
        ImagePtr rgba(VCImage_createNew(nv21->width, nv21->height, VC_FORMAT_RGBA));
        ASSERT_EQ(0, processor.doProcessNV21(nv21->data, nv21->width, nv21->height, rgba->data));
        ASSERT_EQ(0, VCImage_saveToFile(rgba.get(), want.c_str(), 98));
        EXPECT_TRUE(kivtest::readFile(got) == kivtest::readFile(want)) << output;
    }
    KivBandPipeline::setBandRowsForTesting(0);
    processor.release();
}

}  // namespace

namespace {

// A sink gets the stream as it is made, the same bytes; one that refuses
// stops every stage (no hang) with the encoder's failure.
TEST(StreamSink, SameBytesOrAFailure) {
    VFilterBufferedProcessorImpl processor;
    processor.initialize();
    processor.setEffect(401);
    KivBandPipeline::setBandRowsForTesting(64);
    const Bytes jpeg = jpegOf(kWidth, kHeight);
    struct Collect {
        Bytes bytes;
        size_t refuseAfter;
    };
    for (bool png : {false, true}) {
        unsigned char* stream = nullptr;
        size_t length = 0;
        VCDecodeFailure why;
        ASSERT_EQ(0, processor.processStream(jpeg.data(), jpeg.size(), false, {png, 90}, &stream,
                                             &length, &why));
        const Bytes whole = bytesOf(stream, length);
        for (size_t refuseAfter : {SIZE_MAX, size_t(0), whole.size() / 2}) {
            Collect sink{{}, refuseAfter};
            VFilterBufferedProcessorImpl::StreamOutput out = {png, 90};
            out.sink = [](void* user, const unsigned char* bytes, size_t n) {
                Collect* c = static_cast<Collect*>(user);
                if (c->bytes.size() + n > c->refuseAfter) return -1;
                c->bytes.insert(c->bytes.end(), bytes, bytes + n);
                return 0;
            };
            out.sinkUser = &sink;
            const bool fits = refuseAfter >= whole.size();
            EXPECT_EQ(fits ? 0 : VC_ERROR_CODEC_FAILED,
                      processor.processStream(jpeg.data(), jpeg.size(), false, out, &stream,
                                              &length, &why))
                << png << " " << refuseAfter;
            EXPECT_EQ(nullptr, stream);
            if (fits) {
                EXPECT_TRUE(sink.bytes == whole) << png;
            }
        }
    }
    KivBandPipeline::setBandRowsForTesting(0);
    processor.release();
}

}  // namespace
