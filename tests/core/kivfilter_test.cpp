// Base behaviour of effects, driven through the C API as a C caller would.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "core/KivImaging.h"
#include "support/log_capture.h"
#include "test_effects.h"
#include "vccore/vc_log.h"

namespace {

TEST(KivFilter, Values) {
    ProbeEffect effect(431);
    KivFilter* f = &effect;
    LogCapture log;
    EXPECT_EQ(KivImaging_getValue(f, 102, -9), -9);  // no input yet
    EXPECT_EQ(KivImaging_getValue(f, 105, -9), 431);
    std::vector<unsigned char> pixels(6 * 4 * 4);
    ASSERT_EQ(KivImaging_setInputImage(f, pixels.data(), 6, 4, VC_FORMAT_RGBA, 0), 0);
    EXPECT_EQ(KivImaging_getValue(f, 102, -9), 6);
    EXPECT_EQ(KivImaging_getValue(f, 103, -9), 4);
    EXPECT_EQ(KivImaging_getValue(f, 104, -9), static_cast<int>(VC_FORMAT_RGBA));
    for (int id = 106; id <= 110; ++id) EXPECT_EQ(KivImaging_getValue(f, id, 55), 55) << id;
    for (int id : {102, 105, 106, 110, 112}) {
        EXPECT_EQ(KivImaging_setValue(f, id, 1), VC_ERROR_INVALID_PARAM) << id;
    }

    // The flag takes 0 and 1 only; the test is unsigned, so -1 fails too.
    EXPECT_EQ(KivImaging_getValue(f, 111, 7), 0);
    EXPECT_EQ(KivImaging_setValue(f, 111, 2), VC_ERROR_INVALID_PARAM);
    EXPECT_EQ(KivImaging_setValue(f, 111, -1), VC_ERROR_INVALID_PARAM);
    EXPECT_EQ(KivImaging_getValue(f, 111, 7), 0);
    EXPECT_EQ(KivImaging_setValue(f, 111, 1), 0);
    EXPECT_EQ(KivImaging_getValue(f, 111, 7), 1);
    effect.valueFlagSupported = false;
    EXPECT_EQ(KivImaging_setValue(f, 111, 0), VC_ERROR_INVALID_PARAM);
    EXPECT_EQ(KivImaging_getValue(f, 111, 7), 7);

    ProbeEffect untyped(-1);
    EXPECT_EQ(KivImaging_getValue(&untyped, 105, 12), 12);
    ProbeEffect tracking(static_cast<int>(0xB16B00B5u));
    EXPECT_EQ(KivImaging_getValue(&tracking, 105, 12), -1318387531);
}

TEST(KivFilter, ImageReplacement) {
    ProbeEffect effect;
    KivFilter* f = &effect;
    unsigned char a[64] = {0};
    unsigned char b[64] = {0};
    ASSERT_EQ(KivImaging_setInputImage(f, a, 4, 4, VC_FORMAT_RGBA, 21), 0);
    const VCImage* in = effect.inputImage();
    ASSERT_NE(in, nullptr);
    // A wrapper: caller's pointer, not owned, size unknown, extra in the last field.
    EXPECT_EQ(in->data, a);
    EXPECT_EQ(in->wrapped, 1);
    EXPECT_EQ(in->size, 0u);
    EXPECT_EQ(in->uvOffset, 21u);
    EXPECT_EQ(effect.formatChangedCalls, 1);

    // Same shape, other buffer: not a change, but the set hook runs.
    ASSERT_EQ(KivImaging_setInputImage(f, b, 4, 4, VC_FORMAT_RGBA, 0), 0);
    EXPECT_EQ(effect.formatChangedCalls, 1);
    EXPECT_EQ(effect.inputSetCalls, 2);
    // Width, height and format each count as a change.
    ASSERT_EQ(KivImaging_setInputImage(f, b, 2, 8, VC_FORMAT_RGBA, 0), 0);
    ASSERT_EQ(KivImaging_setInputImage(f, b, 2, 4, VC_FORMAT_RGBA, 0), 0);
    ASSERT_EQ(KivImaging_setInputImage(f, b, 2, 4, VC_FORMAT_BGRA, 0), 0);
    EXPECT_EQ(effect.formatChangedCalls, 4);
    // Null data clears the input without hooks; the next input is a change.
    ASSERT_EQ(KivImaging_setInputImage(f, nullptr, 2, 4, VC_FORMAT_BGRA, 0), 0);
    EXPECT_EQ(effect.inputImage(), nullptr);
    EXPECT_EQ(effect.inputSetCalls, 5);
    ASSERT_EQ(KivImaging_setInputImage(f, b, 2, 4, VC_FORMAT_BGRA, 0), 0);
    EXPECT_EQ(effect.formatChangedCalls, 5);

    // A rejected format drops the input that was there.
    effect.rejectedFormat = static_cast<int>(VC_FORMAT_NV21);
    {
        LogCapture log;
        EXPECT_EQ(KivImaging_setInputImage(f, a, 4, 4, VC_FORMAT_NV21, 0), VC_ERROR_UNSUPPORTED);
        EXPECT_EQ(log.countPrefix("VC_ERROR_UNSUPPORTED (-6): core/KivFilter:", VF_LOG_ERROR), 1u);
    }
    EXPECT_EQ(effect.inputImage(), nullptr);
    EXPECT_EQ(KivImaging_supportsInputFormat(f, static_cast<int>(VC_FORMAT_NV21)), 0);

    // Outputs: any shape without input; a mismatch is -4 but the wrapper stays.
    unsigned char out[64] = {0};
    EXPECT_EQ(KivImaging_setOutputImage(f, out, 3, 3, VC_FORMAT_RGBA, 5), 0);
    EXPECT_EQ(effect.outputImage()->uvOffset, 5u);
    ASSERT_EQ(KivImaging_setInputImage(f, a, 4, 4, VC_FORMAT_RGBA, 0), 0);
    EXPECT_EQ(KivImaging_setOutputImage(f, out, 4, 4, VC_FORMAT_RGBA, 0), 0);
    LogCapture log;
    EXPECT_EQ(KivImaging_setOutputImage(f, out, 4, 2, VC_FORMAT_RGBA, 0), VC_ERROR_INVALID_SIZE);
    ASSERT_NE(effect.outputImage(), nullptr);
    EXPECT_EQ(effect.outputImage()->height, 2);
    EXPECT_EQ(effect.outputImage()->wrapped, 1);
    EXPECT_EQ(KivImaging_setOutputImage(f, out, 4, 4, VC_FORMAT_BGRA, 0), VC_ERROR_INVALID_SIZE);
    EXPECT_EQ(KivImaging_setOutputImage(f, nullptr, 4, 4, VC_FORMAT_RGBA, 0), 0);
    EXPECT_EQ(effect.outputImage(), nullptr);
}

TEST(KivFilter, WorkImageLifecycle) {
    // Destroyed through the C API at the end: under ASan a leaked record or a
    // freed caller buffer fails here.
    ProbeEffect* effect = new ProbeEffect();
    KivFilter* f = effect;
    std::vector<unsigned char> pixels(8 * 8 * 4, 0x5a);
    LogCapture log;
    EXPECT_EQ(KivImaging_init(f), VC_ERROR_UNKNOWN);  // no input yet
    EXPECT_EQ(log.countPrefix("VC_ERROR_UNKNOWN (-1): core/KivFilter:", VF_LOG_ERROR), 1u);

    ASSERT_EQ(KivImaging_setInputImage(f, pixels.data(), 8, 4, VC_FORMAT_RGBA, 0), 0);
    ASSERT_EQ(KivImaging_init(f), 0);
    const VCImage* work = effect->workImage();
    ASSERT_NE(work, nullptr);
    EXPECT_EQ(work->wrapped, 0);
    EXPECT_EQ(VCImage_size(work), 8u * 4u * 4u);
    EXPECT_EQ(effect->workChangedCalls, 1);
    unsigned char* buffer = work->data;

    // Same byte count, other shape and format: relabelled, effect not told.
    ASSERT_EQ(KivImaging_setInputImage(f, pixels.data(), 4, 8, VC_FORMAT_BGRA, 0), 0);
    ASSERT_EQ(KivImaging_init(f), 0);
    ASSERT_EQ(effect->workImage(), work);
    EXPECT_EQ(work->data, buffer);
    EXPECT_EQ(work->width, 4);
    EXPECT_EQ(work->height, 8);
    EXPECT_EQ(work->format, VC_FORMAT_BGRA);
    EXPECT_EQ(effect->workChangedCalls, 1);

    // Other byte count: a new buffer of the input's size.
    ASSERT_EQ(KivImaging_setInputImage(f, pixels.data(), 4, 4, VC_FORMAT_NV21, 0), 0);
    ASSERT_EQ(KivImaging_init(f), 0);
    EXPECT_EQ(VCImage_size(effect->workImage()), 24u);  // 4×4 at 12 bits per pixel
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

    // An input whose byte size is unknown cannot get a working image.
    effect->wantsWorkImage = true;
    ASSERT_EQ(KivImaging_setInputImage(f, pixels.data(), 4, 4, 0x12345678, 0), 0);
    EXPECT_EQ(KivImaging_init(f), VC_ERROR_ALLOC_FAILED);
    EXPECT_EQ(log.countPrefix("VC_ERROR_ALLOC_FAILED (-5): core/KivFilter:", VF_LOG_ERROR), 1u);
    EXPECT_EQ(effect->workImage(), nullptr);  // the old buffer is gone, not left dangling
    ASSERT_EQ(KivImaging_setOutputImage(f, pixels.data(), 4, 4, 0x12345678, 0), 0);
    ASSERT_EQ(KivImaging_init(f), VC_ERROR_ALLOC_FAILED);

    int live = ProbeEffect::sLive;
    KivImaging_destroy(f);
    EXPECT_EQ(ProbeEffect::sLive, live - 1);
    EXPECT_EQ(pixels.front(), 0x5a);
    EXPECT_EQ(pixels.back(), 0x5a);
}

}  // namespace
