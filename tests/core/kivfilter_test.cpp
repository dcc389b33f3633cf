// Base behaviour of effects, driven through the C API as a C caller would,
// and the callback relay of the KivImaging handle.
#include <gtest/gtest.h>

#include <functional>
#include <string>
#include <vector>

#include "core/KivImaging.h"
#include "support/image_ptr.h"
#include "support/log_capture.h"
#include "test_effects.h"
#include "vccore/vc_log.h"

extern "C" int kivtest_c_null_handles(void);

namespace {

TEST(KivFilter, Values) {
    ProbeEffect effect(431);
    KivFilter* f = &effect;
    EXPECT_EQ(KivImaging_getValue(f, 102, -9), -9);  // no input yet
    EXPECT_EQ(KivImaging_getValue(f, 105, -9), 431);
    std::vector<unsigned char> pixels(6 * 4 * 4);
    ASSERT_EQ(KivImaging_setInputImage(f, pixels.data(), 6, 4, VC_FORMAT_RGBA, 0), 0);
    EXPECT_EQ(std::vector<int>({6, 4, static_cast<int>(VC_FORMAT_RGBA)}),
              std::vector<int>({KivImaging_getValue(f, 102, -9), KivImaging_getValue(f, 103, -9),
                                KivImaging_getValue(f, 104, -9)}));
    for (int id = 106; id <= 110; ++id) EXPECT_EQ(KivImaging_getValue(f, id, 55), 55) << id;
    for (int id : {102, 105, 106, 110, 112})
        EXPECT_EQ(KivImaging_setValue(f, id, 1), VC_ERROR_INVALID_PARAM) << id;
    // The flag takes 0 and 1 only; the test is unsigned, so -1 fails too.
    EXPECT_EQ(KivImaging_getValue(f, 111, 7), 0);
    for (int bad : {2, -1}) EXPECT_EQ(KivImaging_setValue(f, 111, bad), VC_ERROR_INVALID_PARAM);
    EXPECT_EQ(KivImaging_setValue(f, 111, 1), 0);
    EXPECT_EQ(KivImaging_getValue(f, 111, 7), 1);
    effect.valueFlagSupported = false;
    EXPECT_EQ(KivImaging_setValue(f, 111, 0), VC_ERROR_INVALID_PARAM);
    EXPECT_EQ(KivImaging_getValue(f, 111, 7), 7);
    ProbeEffect untyped(-1), tracking(static_cast<int>(0xB16B00B5u));
    EXPECT_EQ(KivImaging_getValue(&untyped, 105, 12), 12);
    EXPECT_EQ(KivImaging_getValue(&tracking, 105, 12), -1318387531);
}

TEST(KivFilter, ImageReplacement) {
    ProbeEffect effect;
    KivFilter* f = &effect;
    unsigned char a[64] = {0}, b[64] = {0}, out[64] = {0};
    ASSERT_EQ(KivImaging_setInputImage(f, a, 4, 4, VC_FORMAT_RGBA, 21), 0);
    // A wrapper: caller's pointer, not owned, size unknown, extra in the last field.
    ASSERT_NE(effect.inputImage(), nullptr);
    EXPECT_EQ(effect.inputImage()->data, a);
    EXPECT_EQ("4x4 RGBA wrapped 1 size 0 uv 21", VCImageTest_record(effect.inputImage()));
    // Same shape, other buffer: not a change, but the set hook runs; width,
    // height and format each count as a change.
    const struct {
        unsigned char* data;
        int w, h;
        uint32_t format;
        int changes, sets;
    } steps[] = {{b, 4, 4, VC_FORMAT_RGBA, 1, 2},       {b, 2, 8, VC_FORMAT_RGBA, 2, 3},
                 {b, 2, 4, VC_FORMAT_RGBA, 3, 4},       {b, 2, 4, VC_FORMAT_BGRA, 4, 5},
                 {nullptr, 2, 4, VC_FORMAT_BGRA, 4, 5},  // clears the input without hooks
                 {b, 2, 4, VC_FORMAT_BGRA, 5, 6}};       // so the next one is a change
    for (const auto& s : steps) {
        ASSERT_EQ(KivImaging_setInputImage(f, s.data, s.w, s.h, s.format, 0), 0);
        EXPECT_EQ(s.changes * 10 + s.sets, effect.formatChangedCalls * 10 + effect.inputSetCalls);
        EXPECT_EQ(s.data == nullptr, effect.inputImage() == nullptr);
    }
    // A rejected format drops the input that was there.
    effect.rejectedFormat = static_cast<int>(VC_FORMAT_NV21);
    EXPECT_EQ(KivImaging_setInputImage(f, a, 4, 4, VC_FORMAT_NV21, 0), VC_ERROR_UNSUPPORTED);
    EXPECT_EQ(effect.inputImage(), nullptr);
    EXPECT_EQ(KivImaging_supportsInputFormat(f, static_cast<int>(VC_FORMAT_NV21)), 0);
    // Outputs: any shape without input; a mismatch is -4 but the wrapper stays.
    EXPECT_EQ(KivImaging_setOutputImage(f, out, 3, 3, VC_FORMAT_RGBA, 5), 0);
    EXPECT_EQ(effect.outputImage()->uvOffset, 5u);
    ASSERT_EQ(KivImaging_setInputImage(f, a, 4, 4, VC_FORMAT_RGBA, 0), 0);
    EXPECT_EQ(KivImaging_setOutputImage(f, out, 4, 4, VC_FORMAT_RGBA, 0), 0);
    EXPECT_EQ(KivImaging_setOutputImage(f, out, 4, 2, VC_FORMAT_RGBA, 0), VC_ERROR_INVALID_SIZE);
    EXPECT_EQ("4x2 RGBA wrapped 1 size 0 uv 0", VCImageTest_record(effect.outputImage()));
    EXPECT_EQ(KivImaging_setOutputImage(f, out, 4, 4, VC_FORMAT_BGRA, 0), VC_ERROR_INVALID_SIZE);
    EXPECT_EQ(KivImaging_setOutputImage(f, nullptr, 4, 4, VC_FORMAT_RGBA, 0), 0);
    EXPECT_EQ(effect.outputImage(), nullptr);
}

// Destroyed through the C API at the end: under ASan a leaked record or a
// freed caller buffer fails here.
TEST(KivFilter, WorkImageLifecycle) {
    ProbeEffect* effect = new ProbeEffect();
    KivFilter* f = effect;
    std::vector<unsigned char> pixels(8 * 8 * 4, 0x5a);
    EXPECT_EQ(KivImaging_init(f), VC_ERROR_UNKNOWN);  // no input yet
    ASSERT_EQ(KivImaging_setInputImage(f, pixels.data(), 8, 4, VC_FORMAT_RGBA, 0), 0);
    ASSERT_EQ(KivImaging_init(f), 0);
    const VCImage* work = effect->workImage();
    ASSERT_NE(work, nullptr);
    EXPECT_EQ("8x4 RGBA wrapped 0 size 128 uv 0", VCImageTest_record(work));
    EXPECT_EQ(effect->workChangedCalls, 1);
    unsigned char* buffer = work->data;
    // Same byte count, other shape and format: relabelled, effect not told.
    ASSERT_EQ(KivImaging_setInputImage(f, pixels.data(), 4, 8, VC_FORMAT_BGRA, 0), 0);
    ASSERT_EQ(KivImaging_init(f), 0);
    ASSERT_EQ(effect->workImage(), work);
    EXPECT_EQ(work->data, buffer);
    EXPECT_EQ("4x8 BGRA wrapped 0 size 128 uv 0", VCImageTest_record(work));
    EXPECT_EQ(effect->workChangedCalls, 1);
    // Other byte count: a new buffer of the input's size (4x4 at 12 bits a pixel).
    ASSERT_EQ(KivImaging_setInputImage(f, pixels.data(), 4, 4, VC_FORMAT_NV21, 0), 0);
    ASSERT_EQ(KivImaging_init(f), 0);
    EXPECT_EQ(VCImage_size(effect->workImage()), 24u);
    EXPECT_EQ(effect->workChangedCalls, 2);
    // release() frees only the working image, and says so.
    EXPECT_EQ(KivImaging_release(f), 0);
    EXPECT_EQ(effect->workImage(), nullptr);
    EXPECT_EQ(effect->workChangedCalls, 3);
    EXPECT_NE(effect->inputImage(), nullptr);
    // An effect that wants no working image drops the one it had.
    ASSERT_EQ(KivImaging_init(f), 0);
    effect->wantsWorkImage = false;
    EXPECT_EQ(KivImaging_init(f), 0);
    EXPECT_EQ(effect->workImage(), nullptr);
    // An input whose byte size is unknown cannot get a working image; the old
    // buffer is gone, not left dangling.
    effect->wantsWorkImage = true;
    ASSERT_EQ(KivImaging_setInputImage(f, pixels.data(), 4, 4, 0x12345678, 0), 0);
    EXPECT_EQ(KivImaging_init(f), VC_ERROR_ALLOC_FAILED);
    EXPECT_EQ(effect->workImage(), nullptr);
    ASSERT_EQ(KivImaging_setOutputImage(f, pixels.data(), 4, 4, 0x12345678, 0), 0);
    ASSERT_EQ(KivImaging_init(f), VC_ERROR_ALLOC_FAILED);
    const int live = ProbeEffect::sLive;
    KivImaging_destroy(f);
    EXPECT_EQ(ProbeEffect::sLive, live - 1);
    EXPECT_EQ(std::vector<unsigned char>(8 * 8 * 4, 0x5a), pixels);
}

TEST(KivImagingCApi, NullHandlesFromC) {
    LogCapture log;  // keeps the factory's debug lines out of the output
    EXPECT_EQ(kivtest_c_null_handles(), 0) << "failed check at kivimaging_c_api.c line shown";
}

void clientCallback(const char* message, void* context) {
    static_cast<std::vector<std::string>*>(context)->push_back(message);
}

TEST(KivImagingHandle, CallbackRelaysWithClientContext) {
    ProbeEffect effect;
    std::vector<std::string> received;
    // No filter: nothing stored, so nothing can be relayed later.
    KivImaging empty;
    empty.kivImagingSetCallback(clientCallback, &received);
    empty.setFilter(&effect);
    effect.report("dropped");
    // The client sees its own context (the vector), not the relay's.
    KivImaging imaging(&effect);
    imaging.kivImagingSetCallback(clientCallback, &received);
    effect.report("face found");
    effect.report("face lost");
    // A null client callback silences the relay without crashing.
    imaging.kivImagingSetCallback(nullptr, &received);
    effect.report("ignored");
    EXPECT_EQ(std::vector<std::string>({"face found", "face lost"}), received);
}

// Every line and status of the effect base and the option pattern.
TEST(CoreLog, LinesAndStatuses) {
    ProbeEffect effect;
    TwoOptionEffect options;
    const int unknown = static_cast<int>(VCOPTION_KEY_BASE);  // never handed out
    unsigned char pixels[64];
    const std::string kUnknownId = "E Option not found: " + std::to_string(unknown);
    const struct {
        std::function<int()> call;
        int status;
        std::vector<std::string> lines;
    } rows[] = {
        {[&] { return KivImaging_init(&effect); },
         -1,
         {"E VC_ERROR_UNKNOWN (-1): core/KivFilter:#"}},
        {[&] {
             effect.rejectedFormat = static_cast<int>(VC_FORMAT_NV21);
             return KivImaging_setInputImage(&effect, pixels, 4, 4, VC_FORMAT_NV21, 0);
         },
         -6,
         {"E VC_ERROR_UNSUPPORTED (-6): core/KivFilter:#"}},
        {[&] {
             KivImaging_setInputImage(&effect, pixels, 4, 4, 0x12345678, 0);
             return KivImaging_init(&effect);
         },
         -5,
         {"E VC_ERROR_ALLOC_FAILED (-5): core/KivFilter:#"}},
        {[&] { return KivImaging_setOptionByIdI(&options, unknown, 1); }, 0, {kUnknownId}},
        {[&] { return KivImaging_setOptionByIdF(&options, unknown, 1.0f); }, 0, {kUnknownId}},
        {[&] { return KivImaging_setOptionByIdS(&options, unknown, "intensity=0"); },
         0,
         {kUnknownId}},
        {[&] { return KivImaging_getOptionById(&options, unknown).type; }, 4, {kUnknownId}},
        {[&] { return KivImaging_setOptionByIdI(&options, -5, 1); }, 0, {"E Option not found: -5"}},
    };
    for (size_t i = 0; i < sizeof(rows) / sizeof(rows[0]); ++i) {
        LogCapture log;
        EXPECT_EQ(rows[i].status, rows[i].call()) << "row " << i;
        EXPECT_TRUE(log.matches(rows[i].lines)) << "row " << i;
    }
    EXPECT_EQ(0, options.level);  // unknown ids changed nothing
    EXPECT_FLOAT_EQ(-1.0f, options.intensity);
}

}  // namespace
