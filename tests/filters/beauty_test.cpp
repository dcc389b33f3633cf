// Beauty: what each face text sets (and what it refuses), the smoothed
// picture through the buffered processor against a CPU statement of the blur,
// the ellipse, the skin mask and the mix, the untouched picture without a face
// or at intensity 0. Camera orientations: geometric_effects_test.
#include <gtest/gtest.h>

#include <cmath>
#include <string>
#include <vector>

#include "core/filters/sce/beauty.h"
#include "support/log_capture.h"
#include "support/look_reference.h"
#include "support/processor_ptr.h"
#include "vccore/vc_log.h"

namespace {

// llvmpipe lands within 1/255 of the CPU (mediump sums of up to nineteen taps,
// stored as 8-bit twice); 2 leaves room for another driver rounding those
// targets the other way. A wrong weight, tap distance, ellipse or mix moves
// pixels much further.
constexpr int kTolerance = 2;

// The skin range of the face pictures.
const int kToneMin = 0x705040, kToneMax = 0xFFE8D8;

// A face in a 1000x1000 frame.
std::string faceText(int intensity, int l, int t, int r, int b) {
    return "face=1,intensity=" + std::to_string(intensity) +
           ",width=1000,height=1000,left=" + std::to_string(l) + ",top=" + std::to_string(t) +
           ",right=" + std::to_string(r) + ",bottom=" + std::to_string(b) +
           ",tonemin=" + std::to_string(kToneMin) + ",tonemax=" + std::to_string(kToneMax);
}

TEST(Beauty, FaceTextsSetTheStateTheyDescribe) {
    struct Row {
        const char* text;
        int intensity, faceCount, slot;  // the face slot to check, -1 for none
        float facecoord[4];
        int toneMin, toneMax;  // 0xRRGGBB; toneMin -1: the slot as before this text
        std::vector<std::string> warnings = {};
    };
    const int kSame = -1;
    // Applied one after the other to the same effect.
    // clang-format off
    const Row rows[] = {
        // The intensity is clamped; without tones the upper bound drops to 0.
        {"face=1,intensity=9,width=1000,height=1000,left=250,top=250,right=750,bottom=750",
         4, 1, 0, {0.55f, 0.57f, 3, 3}, 0, 0},
        // A range covering (nearly) every colour is ignored.
        {"face=1,width=1000,height=1000,left=250,top=250,right=750,bottom=750,tonemin=0,"
         "tonemax=16777215", 1, 1, 0, {0.55f, 0.57f, 3, 3}, 0, 0},
        {"face=1,intensity=2,width=200,height=100,left=20,top=10,right=120,bottom=90,"
         "tonemin=6307888,tonemax=15786192", 2, 1, 0, {0.4f, 0.57f, 3, 1.875f}, 0x604030, 0xF0E0D0},
        // 0x708000: a minimum within 0.1 in one channel (red) keeps the stored one.
        {"face=1,intensity=2,width=200,height=100,left=20,top=10,right=120,bottom=90,"
         "tonemin=7372800,tonemax=15786192", 2, 1, 0, {}, kSame, 0},
        // The second face goes to its own slot; a face partly outside the frame is kept.
        {"face=2,intensity=3,width=100,height=100,left=-20,top=60,right=30,bottom=140",
         3, 2, 1, {0.1f, 1.07f, 3, 1.875f}, 0, 0},
        {"face=3,width=100,height=100,left=10,top=10,right=90,bottom=90,tonemin=3158064,"
         "tonemax=12632256", 1, 3, 2, {0.55f, 0.57f, 1.875f, 1.875f}, 0x303030, 0xC0C0C0},
        // Without a rectangle only the intensity and the count change.
        {"face=1,intensity=0", 0, 1, 0, {}, kSame, 0},
        {"face=0", 1, 0, -1, {}, 0, 0},
        // Refused rectangles change no slot, and say why; so does an unreadable width.
        {"face=1,width=100,height=100,left=40,top=10,right=40,bottom=90", 1, 1, 0, {}, kSame, 0,
         {"W Beauty: face 1 ignored: its rectangle (40,10)-(40,90) in 100x100 has no area"}},
        {"face=1,width=0,height=100,left=1,top=10,right=40,bottom=90", 1, 1, 0, {}, kSame, 0,
         {"W Beauty: face 1 ignored: its rectangle (1,10)-(40,90) in 0x100 has no area"}},
        {"face=4,width=100,height=100,left=10,top=10,right=40,bottom=90", 1, 4, -1, {}, 0, 0,
         {"W Beauty: face 4 ignored: faces 1 to 3 are kept"}},
        {"face=1,intensity=2,width=wide,height=100,left=0,top=0,right=50,bottom=50,smile=1",
         2, 1, 0, {}, kSame, 0,
         {"W Beauty: 'width=wide' could not be read; the neutral value is used",
          "W Beauty: unknown parameter 'smile' ignored"}},
    };
    // clang-format on
    Beauty beauty;
    EXPECT_EQ(1, beauty.getState().intensity);
    EXPECT_EQ(0, beauty.getState().faceCount);
    for (const Row& r : rows) {
        SCOPED_TRACE(r.text);
        const Beauty::State before = beauty.getState();
        LogCapture log;
        EXPECT_EQ(1, beauty.setOption("parameter", r.text));
        std::vector<std::string> lines = r.warnings;
        lines.insert(lines.begin(), std::string("I EGL: Beauty::setOption = ") + r.text);
        EXPECT_TRUE(log.matches(lines));
        const Beauty::State s = beauty.getState();
        EXPECT_EQ(r.intensity, s.intensity);
        EXPECT_EQ(r.faceCount, s.faceCount);
        if (r.slot < 0) continue;
        const bool same = r.toneMin == kSame;
        for (int k = 0; k < 4; ++k) {
            float want = same ? before.facecoord[r.slot][k] : r.facecoord[k];
            EXPECT_NEAR(want, s.facecoord[r.slot][k], 1e-5) << k;
        }
        for (int k = 0; k < 3; ++k) {
            int shift = 16 - 8 * k;
            float lo = same ? before.skinToneMin[r.slot][k] : (r.toneMin >> shift & 255) / 255.f;
            float hi = same ? before.skinToneMax[r.slot][k] : (r.toneMax >> shift & 255) / 255.f;
            EXPECT_NEAR(lo, s.skinToneMin[r.slot][k], 1e-6) << k;
            EXPECT_NEAR(hi, s.skinToneMax[r.slot][k], 1e-6) << k;
        }
    }
    // Any other name: logged, taken (1), nothing changed.
    LogCapture log;
    EXPECT_EQ(1, beauty.setOption("face", "face=1,intensity=4"));
    EXPECT_TRUE(log.contains(VF_LOG_INFO, "EGL: Beauty::setOption = face=1,intensity=4"));
    EXPECT_EQ(2, beauty.getState().intensity);
    EXPECT_EQ(1, beauty.getState().faceCount);
    EXPECT_EQ(1, beauty.getOptionsCount());
}

struct Draw {
    int width, height, intensity;
    float face[4];      // left, top, right, bottom as fractions of the frame
    const char* extra;  // appended to the text
};

void PrintTo(const Draw& d, std::ostream* os) {
    *os << d.width << "x" << d.height << " intensity " << d.intensity << d.extra;
}

class BeautyThroughProcessor : public ::testing::TestWithParam<Draw> {};

TEST_P(BeautyThroughProcessor, MatchesTheCpuBlurMaskAndMix) {
    const Draw& d = GetParam();
    const int w = d.width, h = d.height;
    lookref::Picture picture(w, h, lookref::makeFacePicture(w, h));
    std::string text = faceText(d.intensity, int(d.face[0] * 1000), int(d.face[1] * 1000),
                                int(d.face[2] * 1000), int(d.face[3] * 1000)) +
                       d.extra;
    LogCapture quiet;
    ProcessorPtr processor = ProcessorTest_create();
    processor->setEffect(446);
    processor->setEffectParameter(text.c_str());
    std::vector<uint8_t> out(size_t(w) * h * 4, 0x5A);
    ASSERT_EQ(0, processor->doProcessRGBA(picture.rgba().data(), w, h, out.data(), VC_FORMAT_RGBA));
    Beauty::State s = static_cast<Beauty*>(processor->getEffect())->getState();
    processor.reset();

    if (s.intensity == 0 || s.faceCount == 0) {
        EXPECT_EQ(picture.rgba(), out);  // the copy pass: the picture itself, opaque
        return;
    }
    lookref::BeautyFace face{s.intensity, {}, {}, {}};
    for (int k = 0; k < 4; ++k) face.facecoord[k] = s.facecoord[0][k];
    for (int k = 0; k < 3; ++k) {
        face.toneMin[k] = s.skinToneMin[0][k];
        face.toneMax[k] = s.skinToneMax[0][k];
    }
    // The state read back is the one the texts set: the ellipse from the rectangle.
    EXPECT_NEAR(0.05f + (d.face[0] + d.face[2]) / 2, face.facecoord[0], 1e-3);
    EXPECT_NEAR(0.07f + (d.face[1] + d.face[3]) / 2, face.facecoord[1], 1e-3);
    lookref::expectWithin(lookref::renderBeauty(picture, face), out.data(), kTolerance, "beauty");
    // And the smoothing did something: skin inside the face moved.
    size_t changed = 0;
    for (size_t i = 0; i < out.size(); ++i) changed += out[i] != picture.rgba()[i];
    EXPECT_GT(changed, out.size() / 50);
}

// clang-format off
INSTANTIATE_TEST_SUITE_P(Faces, BeautyThroughProcessor, ::testing::Values(
    Draw{128, 96, 1, {0.2f, 0.2f, 0.7f, 0.75f}, ""},
    Draw{121, 95, 2, {0.2f, 0.2f, 0.7f, 0.75f}, ""},
    Draw{123, 89, 4, {0.2f, 0.2f, 0.7f, 0.75f}, ""},
    Draw{64, 48, 4, {-0.2f, 0.4f, 0.5f, 1.3f}, ""},    // partly outside the picture
    Draw{64, 48, 2, {-1.0f, -1.0f, 2.0f, 2.0f}, ""},   // larger: every skin pixel smoothed
    // Faces 2 and 3 described too: only the first is used.
    Draw{64, 48, 3, {0.2f, 0.2f, 0.7f, 0.75f},
         ",face=3,width=10,height=10,left=0,top=0,right=1,bottom=1"},
    Draw{61, 47, 0, {0.2f, 0.2f, 0.7f, 0.75f}, ""},    // intensity 0: the picture as it is
    Draw{61, 47, 3, {0.2f, 0.2f, 0.7f, 0.75f}, ",face=0"}));
// clang-format on

}  // namespace
