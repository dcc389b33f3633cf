// The streamed path of the buffered processor: every effect the factory
// serves gives, band by band, the very bytes of the whole-picture path.
// kiv-test-labels: threads
#include <gtest/gtest.h>
#include <stdlib.h>
#include <string.h>

#include <algorithm>
#include <functional>
#include <numeric>
#include <string>
#include <vector>

#include "core/KivBandPipeline.h"
#include "core/KivDecodeAhead.h"
#include "core/KivFilter.h"
#include "core/KivImaging.h"
#include "core/KivPixelReach.h"
#include "core/VFilterBufferedProcessorImpl.h"
#include "core/egl/Platform.h"
#include "core/filters/sce/singleCameraEffects.h"
#include "support/image_ptr.h"
#include "support/picture_streams.h"
#include "support/temp_dir.h"
#include "support/test_picture.h"
#include "vccore/vc_file.h"
#include "vccore/vc_picture.h"

namespace {

using kivtest::Bytes;

// Even sizes (NV21 needs them); taller than three 64-row bands.
const int kWidth = 72;
const int kHeight = 210;

// Every id of the built-in ranges that the factory serves.
std::vector<int> factoryIds() {
    std::vector<int> ids;
    for (auto range :
         {std::make_pair(200, 213), std::make_pair(400, 447), std::make_pair(500, 508)})
        for (int id = range.first; id <= range.second; ++id) {
            KivFilter* effect = KivImaging_create(id, nullptr);
            if (effect != nullptr && effect->getFilterType() == id) ids.push_back(id);
            delete effect;
        }
    return ids;
}

Bytes owned(unsigned char* stream, size_t length) {
    Bytes out(stream, stream + length);
    free(stream);
    return out;
}

// The picture as a PNG (alpha varying) or a JPEG (opaque).
Bytes pictureFile(int width, int height, bool png = false) {
    Bytes rgba = kivtest::makeTestPicture(width, height, !png);
    ImagePtr image = VCImageTest_wrap(rgba.data(), width, height, VC_FORMAT_RGBA);
    return png ? kivtest::encodePng(image.get()) : kivtest::encodeJpeg(image.get());
}

// Effects the streamed path leaves to the whole picture: those that do not
// say what they read, and neighbour-reading ones that draw by themselves
// (their own passes would read rows no pass of the band drew).
bool declines(KivFilter* effect) {
    if (dynamic_cast<KivPixelReachSource*>(effect) == nullptr) return true;
    return KivFilter_pixelReach(effect, kWidth, kHeight).kind != KivPixelReach::SAME_PIXEL &&
           dynamic_cast<SingleCameraEffects*>(effect) == nullptr;
}

// One processor with 64-row bands for a whole suite.
struct Bands {
    Bands() {
        processor.initialize();
        KivBandPipeline::setBandRowsForTesting(64);
    }
    ~Bands() {
        KivBandPipeline::setBandRowsForTesting(0);
        processor.release();
    }
    // The streamed path; *rc its status, *why its decoding verdict.
    Bytes streamed(const Bytes& input, bool nv21, VFilterBufferedProcessorImpl::StreamOutput out,
                   int* rc, VCDecodeFailure* why = nullptr) {
        unsigned char* stream = nullptr;
        size_t length = 0;
        VCDecodeFailure verdict = VC_DECODE_CORRUPT;
        *rc = processor.processStream(input.data(), input.size(), nv21, out, &stream, &length,
                                      &verdict);
        if (why != nullptr) *why = verdict;
        EXPECT_EQ(*rc == 0 && out.sink == nullptr, stream != nullptr);
        return owned(stream, length);
    }
    // The whole-picture path: decoded into `format`, one draw, encoded.
    Bytes whole(const Bytes& input, uint32_t format, bool png, int quality) {
        ImagePtr in(VCImage_createEmpty(0, 0, format));
        EXPECT_EQ(0, VCImage_decodeFromJpeg(in.get(), input.data(), (int)input.size()));
        ImagePtr out(VCImage_createNew(in->width, in->height, VC_FORMAT_RGBA));
        EXPECT_EQ(0, format == VC_FORMAT_NV21
                         ? processor.doProcessNV21(in->data, in->width, in->height, out->data)
                         : processor.doProcessRGBA(in->data, in->width, in->height, out->data,
                                                   VC_FORMAT_RGBA));
        return png ? kivtest::encodePng(out.get()) : kivtest::encodeJpeg(out.get(), quality);
    }
    VFilterBufferedProcessorImpl processor;
};

class StreamTest : public ::testing::TestWithParam<int> {
protected:
    static void SetUpTestSuite() { sBands = new Bands(); }
    static void TearDownTestSuite() { delete sBands; }
    // Each path gets the effect fresh: some move on from frame to frame.
    Bytes streamed(const Bytes& input, bool nv21, bool png, int quality, int* rc) {
        sBands->processor.setEffect(GetParam());
        VCDecodeFailure why;
        Bytes out = sBands->streamed(input, nv21, {png, quality}, rc, &why);
        EXPECT_EQ(VC_DECODE_OK, why);
        return out;
    }
    Bytes whole(const Bytes& input, uint32_t format, bool png, int quality) {
        sBands->processor.setEffect(GetParam());
        return sBands->whole(input, format, png, quality);
    }
    KivFilter* effect() {
        EXPECT_EQ(0, sBands->processor.setEffect(GetParam()));
        return sBands->processor.getEffect();
    }
    static Bands* sBands;
};

Bands* StreamTest::sBands = nullptr;

TEST_P(StreamTest, BandsGiveTheWholePicturesBytes) {
    static const Bytes jpeg = pictureFile(kWidth, kHeight),
                       png = pictureFile(kWidth, kHeight, true);
    // Sides near a texture's limit, where texel centres are furthest from
    // what the GPU interpolates.
    static const Bytes wide = pictureFile(16000, 8), tall = pictureFile(8, 16000);
    struct Case {
        const Bytes& input;
        bool nv21, png;
        int quality;
    } cases[] = {
        {jpeg, false, false, 90},  // kivimaging apply
        {jpeg, true, false, 98},   // processFile
        {png, false, true, 0},     // PNG in and out, alpha kept
        {wide, false, false, 90},  {tall, false, false, 90},
    };
    const bool declined = declines(effect());
    for (const Case& c : cases) {
        SCOPED_TRACE(testing::Message() << "nv21 " << c.nv21 << " png " << c.png);
        int rc = -1;
        Bytes band = streamed(c.input, c.nv21, c.png, c.quality, &rc);
        if (rc == VC_ERROR_UNSUPPORTED && declined) return;
        ASSERT_EQ(0, rc);
        EXPECT_TRUE(band ==
                    whole(c.input, c.nv21 ? VC_FORMAT_NV21 : VC_FORMAT_RGBA, c.png, c.quality));
    }
}

// Effects that read rows around their own keep those rows until every band
// that reads them is drawn: rows a page wide, so that a row given back too
// early really reads as zeros.
TEST_P(StreamTest, NeighbourReadingEffectsKeepTheirReach) {
    const int width = 1024, height = 1800;
    const KivPixelReach reach = KivFilter_pixelReach(effect(), width, height);
    if (reach.kind != KivPixelReach::NEIGHBOURS) GTEST_SKIP() << "reads no neighbours";
    EXPECT_GT(reach.haloRows, 0);
    static const Bytes input = pictureFile(width, height);
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
    for (auto size : {std::make_pair(256, 64), std::make_pair(64, 448), std::make_pair(200, 150)}) {
        const Bytes input = pictureFile(size.first, size.second);
        const KivPixelReach reach = KivFilter_pixelReach(effect(), size.first, size.second);
        const bool near = reach.kind == KivPixelReach::NEIGHBOURS;
        const int rows = near ? reach.haloRows + 2 : 2, columns = near ? reach.haloColumns + 2 : 2;
        const bool tiles = !declines(effect()) && reach.kind != KivPixelReach::WHOLE_PICTURE &&
                           2 * rows < 128 && (size.first <= 128 || 2 * columns < 128);
        for (bool nv21 : {false, true}) {
            SCOPED_TRACE(testing::Message()
                         << size.first << "x" << size.second << " nv21 " << nv21);
            int rc = -1;
            const Bytes untiled = streamed(input, nv21, true, 0, &rc);
            Platform::setMaximumTextureSizeForTesting(128);
            const Bytes tiled = streamed(input, nv21, true, 0, &rc);
            Platform::resetForTesting();
            ASSERT_EQ(tiles ? 0 : VC_ERROR_UNSUPPORTED, rc);
            if (!tiles || tiled == untiled) continue;
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

// What cannot stream says so before anything is drawn; what fails midway
// stops every stage and says why. A sink gets the stream as it is made, the
// same bytes; one that refuses stops every stage (no hang) with the
// encoder's failure.
// A tiled picture's rows in CPU memory taking turns in a ring of two: a band
// takes over the pages of the band two before it (their rows still there,
// not faulted in afresh as zeros), which reads as zeros after; the band
// before keeps its rows; the last band may be short. Bands that are not
// whole pages have no ring.
TEST(RowStore, BandsTakeTurnsInARing) {
    const int w = 64, bandRows = 64, bands = 5, h = bandRows * bands - 8;
    const size_t rowBytes = w * 4;
    KivRowStore rows;
    ASSERT_TRUE(rows.make(w, h));
    EXPECT_FALSE(rows.takeBand(0));
    EXPECT_FALSE(rows.useBandRing(3, 2));
    ASSERT_TRUE(rows.useBandRing(bandRows, 2));
    EXPECT_FALSE(rows.useBandRing(bandRows, 2));
    auto rowsIn = [&](int band) { return std::min(bandRows, h - band * bandRows); };
    auto fill = [&](int band, int seed) {
        for (int y = 0; y < rowsIn(band); ++y)
            memset(rows.row(band * bandRows + y), seed + y, rowBytes);
    };
    // Whether every byte of the band's rows is `seed` + its row (0: zeros).
    auto holds = [&](int band, int seed) {
        for (int y = 0; y < rowsIn(band); ++y) {
            const unsigned char* row = rows.row(band * bandRows + y);
            const unsigned char want = seed == 0 ? 0 : (unsigned char)(seed + y);
            for (size_t i = 0; i < rowBytes; ++i)
                if (row[i] != want) return false;
        }
        return true;
    };
    for (int band = 0; band < bands; ++band) {
        SCOPED_TRACE(band);
        ASSERT_TRUE(rows.takeBand(band));
        EXPECT_TRUE(holds(band, band < 2 ? 0 : 10 * (band - 1)));
        fill(band, 10 * (band + 1));
        if (band >= 1) {
            EXPECT_TRUE(holds(band - 1, 10 * band));
        }
        if (band >= 2) {
            EXPECT_TRUE(holds(band - 2, 0));
        }
    }
    EXPECT_FALSE(rows.takeBand(bands));
}

TEST(StreamRefusal, StatusReasonAndSinks) {
    Bands bands;
    bands.processor.setEffect(401);
    const Bytes jpeg = pictureFile(kWidth, kHeight), odd = pictureFile(kWidth - 1, kHeight);
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
        int rc = -1;
        VCDecodeFailure why;
        bands.streamed(row.input, row.nv21, {false, 90}, &rc, &why);
        EXPECT_EQ(row.status, rc) << row.what;
        EXPECT_EQ(row.why, why) << row.what;
        Platform::resetForTesting();
    }
    unsigned char* stream = nullptr;
    size_t length = 0;
    VCDecodeFailure why;
    EXPECT_EQ(VC_ERROR_NULL_PARAM, bands.processor.processStream(nullptr, 0, false, {false, 90},
                                                                 &stream, &length, &why));
    struct Collect {
        Bytes bytes;
        size_t refuseAfter;
    };
    for (bool png : {false, true}) {
        int rc = -1;
        const Bytes whole = bands.streamed(jpeg, false, {png, 90}, &rc);
        ASSERT_EQ(0, rc);
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
            bands.streamed(jpeg, false, out, &rc);
            EXPECT_EQ(fits ? 0 : VC_ERROR_CODEC_FAILED, rc) << png << " " << refuseAfter;
            EXPECT_TRUE(!fits || sink.bytes == whole) << png;
        }
    }
}

// processFile streams a picture into a JPEG output, asks for the output path
// once, and leaves other outputs (and pictures it cannot stream) to the
// whole-picture path: the files are those of load, doProcessNV21 and save.
TEST(StreamFile, ProcessFileWritesTheWholePathsFile) {
    kivtest::TempDir dir;
    Bands bands;
    bands.processor.setEffect(422);
    const std::string even = dir.file("even.jpg"), odd = dir.file("odd.jpg");
    kivtest::writeFile(even, pictureFile(kWidth, kHeight));
    kivtest::writeFile(odd, pictureFile(kWidth - 1, kHeight - 1));
    // Odd sizes do not load as NV21 at all, streamed or not.
    EXPECT_EQ(VFilterBufferedProcessorImpl::FILE_LOAD_FAILED,
              bands.processor.processFilePath(odd.c_str(), [&]() {
                  ADD_FAILURE() << "output asked for";
                  return "never.jpg";
              }));
    for (const char* output : {"out.JPG", "out.png"}) {
        const std::string got = dir.file(output), want = dir.file(std::string("whole_") + output);
        int asked = 0;
        EXPECT_EQ(VFilterBufferedProcessorImpl::FILE_OK,
                  bands.processor.processFilePath(even.c_str(), [&]() {
                      ++asked;
                      return got.c_str();
                  }));
        EXPECT_EQ(1, asked) << output;
        ImagePtr nv21(VCImage_createEmpty(0, 0, VC_FORMAT_NV21));
        ASSERT_EQ(0, VCImage_loadFromFile(nv21.get(), even.c_str()));
        ImagePtr rgba(VCImage_createNew(nv21->width, nv21->height, VC_FORMAT_RGBA));
        ASSERT_EQ(0,
                  bands.processor.doProcessNV21(nv21->data, nv21->width, nv21->height, rgba->data));
        ASSERT_EQ(0, VCImage_saveToFile(rgba.get(), want.c_str(), 98));
        EXPECT_TRUE(kivtest::readFile(got) == kivtest::readFile(want)) << output;
    }
}

// The rows a plain reader decodes, `width * 4` bytes apart.
Bytes decodedRows(const Bytes& input) {
    struct Rows {
        Bytes rgba;
        static int add(void* self, const unsigned char* rgba, int, int rows) {
            Rows* r = static_cast<Rows*>(self);
            r->rgba.insert(r->rgba.end(), rgba, rgba + (size_t)rows * r->rowBytes);
            return 0;
        }
        size_t rowBytes;
    } rows{{}, 0};
    VCStreamReader* reader = VCStreamReader_open(input.data(), input.size());
    int width = 0, height = 0;
    EXPECT_EQ(0, VCStreamReader_readHeader(reader, &width, &height));
    rows.rowBytes = (size_t)width * 4;
    EXPECT_EQ(0, VCStreamReader_readBands(reader, 16, Rows::add, &rows));
    VCStreamReader_close(reader);
    return rows.rgba;
}

// What a band pipeline does with taken-over rows, as a table: where they go
// (`pitch` bytes apart, padding marked), in what order, and a refusal at a
// chosen row.
struct Consumer {
    explicit Consumer(int width, int height, size_t pitch, int refuseAt = -1, int placeRefusal = 0)
        : width(width),
          pitch(pitch),
          refuseAt(refuseAt),
          placeRefusal(placeRefusal),
          rows((size_t)height * pitch, 0xA5) {}
    static unsigned char* place(void* self, int first, int) {
        Consumer* c = static_cast<Consumer*>(self);
        if (c->placeRefusal != 0 && first >= c->refuseAt) return nullptr;
        return c->rows.data() + (size_t)first * c->pitch;
    }
    static int band(void* self, const unsigned char* rgba, int first, int count) {
        Consumer* c = static_cast<Consumer*>(self);
        EXPECT_EQ(c->next, first);
        EXPECT_EQ(c->rows.data() + (size_t)first * c->pitch, rgba);
        c->next = first + count;
        return c->placeRefusal == 0 && c->refuseAt >= 0 && first >= c->refuseAt ? -42 : 0;
    }
    // The rows without their padding; false when the padding was written.
    bool unpadded(Bytes* out) const {
        bool padding = true;
        for (size_t y = 0; y < rows.size() / pitch; ++y) {
            const unsigned char* row = rows.data() + y * pitch;
            out->insert(out->end(), row, row + (size_t)width * 4);
            for (size_t x = (size_t)width * 4; x < pitch; ++x) padding &= row[x] == 0xA5;
        }
        return padding;
    }
    int width;
    size_t pitch;
    int refuseAt, placeRefusal;
    Bytes rows;
    int next = 0;
};

// A picture decoding ahead hands its kept rows on, then decodes straight
// where the consumer places them (at the consumer's pitch, the kept rows'
// one or another), whatever part the budget kept: the plain reader's rows,
// in order, padding untouched. The kept rows stop at the budget (whole
// 16-row bands) or at the picture's end. A picture is taken over once.
TEST(DecodeAhead, HandsOnTheReadersRowsWithinItsBudget) {
    const int width = 70, height = 210;  // kept rows 280 bytes -> 320 apart
    const size_t kept = 320;
    for (bool png : {false, true}) {
        const Bytes input = pictureFile(width, height, png);
        const Bytes want = decodedRows(input);
        struct Case {
            size_t budget;
            int keptRows;
        } cases[] = {{0, 0}, {kept * 40, 32}, {kept * 300, height}};
        for (const Case& c : cases)
            for (size_t pitch : {kept, size_t(width * 4), kept + 64}) {
                SCOPED_TRACE(testing::Message()
                             << "png " << png << " budget " << c.budget << " pitch " << pitch);
                KivDecodeAhead ahead(input.data(), input.size(), c.budget);
                ASSERT_TRUE(ahead.ok());
                EXPECT_EQ(width, ahead.width());
                EXPECT_EQ(height, ahead.height());
                EXPECT_EQ(c.keptRows, ahead.keptRowsWhenWaiting());
                Consumer consumer(width, height, pitch);
                EXPECT_EQ(0, ahead.takeOver(pitch, Consumer::place, Consumer::band, &consumer));
                EXPECT_EQ(height, consumer.next);
                Bytes got;
                EXPECT_TRUE(consumer.unpadded(&got));
                EXPECT_TRUE(got == want);
                // Once only.
                EXPECT_EQ(VC_ERROR_INVALID_STATE,
                          ahead.takeOver(pitch, Consumer::place, Consumer::band, &consumer));
            }
    }
}

// Failures end the decoding without a hang: a picture cut short says why
// after its good rows; a consumer that refuses a place or a band stops the
// decoder with its status, from the kept rows or after them; a decoding
// nobody takes over stops when it is destroyed; bytes that are not a
// picture start nothing.
TEST(DecodeAhead, FailuresEndTheDecoding) {
    const int width = 64, height = 210;
    const Bytes jpeg = pictureFile(width, height);
    const Bytes truncated(jpeg.begin(), jpeg.begin() + jpeg.size() / 2);
    const size_t pitch = width * 4, budget = pitch * 64;
    struct Row {
        const char* what;
        const Bytes& input;
        int refuseAt, placeRefusal;
        int status;
        VCDecodeFailure why;
    } table[] = {
        {"cut short", truncated, -1, 0, VC_ERROR_CODEC_FAILED, VC_DECODE_TRUNCATED},
        {"place refused in the kept rows", jpeg, 32, 1, VC_ERROR_INVALID_STATE, VC_DECODE_OK},
        {"place refused after them", jpeg, 128, 1, VC_ERROR_INVALID_STATE, VC_DECODE_OK},
        {"band refused in the kept rows", jpeg, 32, 0, -42, VC_DECODE_OK},
        {"band refused after them", jpeg, 128, 0, -42, VC_DECODE_OK},
    };
    for (const Row& row : table) {
        KivDecodeAhead ahead(row.input.data(), row.input.size(), budget);
        ASSERT_TRUE(ahead.ok()) << row.what;
        Consumer consumer(width, height, pitch, row.refuseAt, row.placeRefusal);
        EXPECT_EQ(row.status, ahead.takeOver(pitch, Consumer::place, Consumer::band, &consumer))
            << row.what;
        EXPECT_EQ(row.why, ahead.failure()) << row.what;
        if (row.refuseAt >= 0) {
            EXPECT_EQ(row.placeRefusal != 0 ? row.refuseAt : row.refuseAt + 16, consumer.next)
                << row.what;
        }
    }
    for (size_t keep : {size_t(0), budget, pitch * 300}) {
        KivDecodeAhead abandoned(jpeg.data(), jpeg.size(), keep);
        EXPECT_TRUE(abandoned.ok());
    }
    const Bytes text = {'n', 'o', 't', ' ', 'a', ' ', 'p', 'i', 'c'};
    KivDecodeAhead none(text.data(), text.size(), budget);
    EXPECT_FALSE(none.ok());
    Consumer consumer(width, height, pitch);
    EXPECT_EQ(VC_ERROR_INVALID_STATE,
              none.takeOver(pitch, Consumer::place, Consumer::band, &consumer));
}

// The processor takes a picture decoding ahead over for RGBA (JPEG or PNG
// out, the budget short of the picture or not, tiles too) and gives the
// bytes it gives without; through NV21 it decodes the picture itself.
TEST(DecodeAhead, ProcessorGivesTheSameBytes) {
    Bands bands;
    bands.processor.setEffect(401);
    const Bytes jpeg = pictureFile(kWidth, kHeight), png = pictureFile(kWidth, kHeight, true);
    const Bytes truncated(jpeg.begin(), jpeg.begin() + jpeg.size() * 2 / 3);
    struct Case {
        const Bytes& input;
        bool nv21, png;
        size_t budget;
        int maxTexture;  // 0: the GPU's own
        int status;
        VCDecodeFailure why;
    } cases[] = {
        {jpeg, false, false, 0, 0, 0, VC_DECODE_OK},
        {jpeg, false, false, (size_t)kWidth * 4 * 48, 0, 0, VC_DECODE_OK},
        {jpeg, false, true, SIZE_MAX, 0, 0, VC_DECODE_OK},
        {png, false, true, (size_t)kWidth * 4 * 100, 0, 0, VC_DECODE_OK},
        {jpeg, false, false, (size_t)kWidth * 4 * 48, 128, 0, VC_DECODE_OK},
        {jpeg, true, false, SIZE_MAX, 0, 0, VC_DECODE_OK},
        {truncated, false, false, (size_t)kWidth * 4 * 48, 0, VC_ERROR_CODEC_FAILED,
         VC_DECODE_TRUNCATED},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(testing::Message() << "nv21 " << c.nv21 << " png " << c.png << " budget "
                                        << c.budget << " texture " << c.maxTexture);
        if (c.maxTexture > 0) Platform::setMaximumTextureSizeForTesting(c.maxTexture);
        int rc = -1;
        VCDecodeFailure why;
        const Bytes plain = bands.streamed(c.input, c.nv21, {c.png, 90}, &rc, &why);
        ASSERT_EQ(c.status, rc);
        ASSERT_EQ(c.why, why);
        KivDecodeAhead ahead(c.input.data(), c.input.size(), c.budget);
        unsigned char* stream = nullptr;
        size_t length = 0;
        EXPECT_EQ(c.status,
                  bands.processor.processStream(c.input.data(), c.input.size(), c.nv21, {c.png, 90},
                                                &stream, &length, &why, &ahead));
        EXPECT_EQ(c.why, why);
        EXPECT_TRUE(owned(stream, length) == plain);
        Platform::resetForTesting();
    }
}

}  // namespace
