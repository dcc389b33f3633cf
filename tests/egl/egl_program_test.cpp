// EglProgram on llvmpipe: what reaches the framebuffer for each geometry and
// effect path (checked against a CPU mapping of the same quad), the default
// fallbacks, effect replacement and failure, geometry and texture-unit rules;
// the fixture sees that no GL object is left alive. Snippets of real looks
// drawn through the program against the CPU: tests/filters.
#include <GLES2/gl2.h>
#include <GLES2/gl2ext.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "core/KivFilter.h"
#include "core/egl/EglProgram.h"
#include "core/egl/EglRecycler.h"
#include "support/gl_context.h"
#include "support/log_capture.h"
#include "vccore/vc_log.h"

using android::sp;
using Pixels = std::vector<uint8_t>;

namespace {

const int W = 5;
const int H = 3;

// An effect driven by a fragment snippet, counting what the program asks of it.
class TestFilter : public KivFilter {
public:
    explicit TestFilter(const char* code, int type = 403) : mCode(code), mType(type) {}
    int doEffect() override { return 0; }
    int getFilterType() const override { return mType; }
    int loadPartialFragmentShader(EglProgram& program, const char*, unsigned int& id) override {
        loads++;
        if (sabotage) {  // takes the vertex stage away: even the default cannot link
            program.getShader()->unBindVertexShader();
            return -1;
        }
        program.setDrawFlag(!selfDrawing);
        id = selfDrawing ? 0 : program.loadFragmentShader(mCode, false);
        if (selfDrawing) return 0;
        return id == 0 ? -1 : program.bindFragmentShader(id);
    }
    int loadExtFragmentShader(EglProgram& program) override {
        loads++;
        return static_cast<int>(program.loadFragmentShader(mCode, true));
    }
    int onDrawFrame(EglProgram&) override {
        draws++;
        if (selfDrawing) {  // draws cyan on its own
            glClearColor(0.0f, 1.0f, 1.0f, 1.0f);
            glClear(GL_COLOR_BUFFER_BIT);
        }
        return drawResult;
    }
    int releaseGL(EglRecycler& recycler) override {
        releasedWith = &recycler;
        return 0;
    }

    const char* mCode;
    int mType;
    int loads = 0, draws = 0, drawResult = 0;
    bool sabotage = false, selfDrawing = false;
    EglRecycler* releasedWith = nullptr;
};

Pixels pattern(int seed) {
    Pixels px(W * H * 4);
    for (size_t i = 0; i < px.size(); i++)
        px[i] = static_cast<uint8_t>((i * 37 + seed * 101) % 251);
    return px;
}

// What a camera geometry draws (rows bottom-up); past the four types there are
// no texture coordinates and every pixel reads (0,0). Alpha forced to 255
// unless keepAlpha.
Pixels expectedFor(const Pixels& src, int type, bool keepAlpha = false) {
    const bool flipX[] = {false, false, true, true}, flipY[] = {true, false, true, false};
    Pixels out(src.size());
    for (int y = 0; y < H; y++) {
        for (int x = 0; x < W; x++) {
            int sx = type > 3 ? 0 : flipX[type] ? W - 1 - x : x;
            int sy = type > 3 ? 0 : flipY[type] ? H - 1 - y : y;
            for (int c = 0; c < 4; c++) {
                out[(y * W + x) * 4 + c] = c == 3 && !keepAlpha ? 255 : src[(sy * W + sx) * 4 + c];
            }
        }
    }
    return out;
}

class EglProgramTest : public GlContextTest {
protected:
    void SetUp() override {
        GlContextTest::SetUp();
        if (HasFatalFailure()) return;
        ASSERT_TRUE(GlTest_makeExternalTexture(W, H, mSrc.data(), &mInput));
        ASSERT_TRUE(GlTest_makeExternalTexture(W, H, mSrc2.data(), &mInput2));
        ASSERT_TRUE(GlTest_makeTarget(W, H, &mTarget));
        mProgram = new EglProgram();
        ASSERT_EQ(mProgram->setCameraGeometry(W, H, 0, 0), 0);
        ASSERT_EQ(mProgram->setPreviewGeometry(W, H, true), 0);
    }
    void TearDown() override {
        if (mProgram != nullptr) mProgram->release();
        mProgram.clear();
        GlTest_deleteExternalTexture(&mInput);
        GlTest_deleteExternalTexture(&mInput2);
        GlTest_deleteTarget(&mTarget);
        GlContextTest::TearDown();
    }
    // Binds the inputs to units 0 and 1, draws one frame, reads the target.
    Pixels draw(int* result = nullptr) {
        glBindFramebuffer(GL_FRAMEBUFFER, mTarget.framebuffer);
        glClearColor(0, 0, 0, 0);
        glClear(GL_COLOR_BUFFER_BIT);
        glActiveTexture(GL_TEXTURE1);
        glBindTexture(GL_TEXTURE_EXTERNAL_OES, mInput2.external);
        glActiveTexture(GL_TEXTURE0);
        glBindTexture(GL_TEXTURE_EXTERNAL_OES, mInput.external);
        int r = mProgram->onDrawFrame();
        if (result != nullptr) *result = r;
        return GlTest_readPixels(W, H);
    }
    void normal() { mProgram->setCameraGeometryType(EglProgram::GEOMETRY_NORMAL, 0); }

    Pixels mSrc = pattern(1), mSrc2 = pattern(2);
    GlExternalTexture mInput, mInput2;
    GlTarget mTarget;
    sp<EglProgram> mProgram;
};

TEST(EglProgramGeometryTest, SettersValidateAndDefault) {
    sp<EglProgram> program = new EglProgram();
    EXPECT_EQ(program->getCameraMode(), 10);
    EXPECT_EQ(program->getCameraGeometryType(0), EglProgram::GEOMETRY_VFLIP);
    EXPECT_EQ(program->getCameraGeometryType(1), EglProgram::GEOMETRY_ROTATE_180);
    EXPECT_TRUE(program->getPreviewFlip());
    EXPECT_TRUE(program->getDrawFlag());

    EXPECT_EQ(program->setCameraGeometry(640, 480, 0, 0), 0);
    EXPECT_EQ(program->getCameraWidth2(), 640);
    EXPECT_EQ(program->getCameraHeight2(), 640);  // the width, not the height
    EXPECT_EQ(program->setCameraGeometry(640, 480, 320, 240), 0);
    EXPECT_EQ(program->getCameraHeight2(), 240);

    LogCapture log;
    EXPECT_EQ(program->setCameraGeometry(0, 480, 1, 1), -3);
    EXPECT_EQ(program->setCameraGeometry(640, -1, 1, 1), -3);
    EXPECT_EQ(program->getCameraWidth(), 640);
    EXPECT_EQ(program->getCameraWidth2(), 320);
    EXPECT_EQ(program->setPreviewGeometry(1280, 720, false), 0);
    EXPECT_EQ(program->setPreviewGeometry(0, 480, true), -3);
    EXPECT_EQ(program->getPreviewWidth(), 1280);
    EXPECT_EQ(program->getPreviewHeight(), 720);
    EXPECT_FALSE(program->getPreviewFlip());
    ASSERT_EQ(log.lines().size(), 3u);
    EXPECT_EQ(log.lines()[0].text.rfind("VC_ERROR_INVALID_PARAM (-3): core/egl/EglProgram:", 0),
              0u);

    program->setCameraGeometryType(EglProgram::GEOMETRY_HFLIP, 0);
    program->setCameraGeometryType(EglProgram::GEOMETRY_NORMAL, 7);  // any camera but 0 is 1
    EXPECT_EQ(program->getCameraGeometryType(0), EglProgram::GEOMETRY_HFLIP);
    EXPECT_EQ(program->getCameraGeometryType(1), EglProgram::GEOMETRY_NORMAL);
}

TEST_F(EglProgramTest, PassThroughDrawsEveryGeometryExactly) {
    ASSERT_EQ(mProgram->initialize(10, false), 0);
    for (int type = 0; type <= 4; type++) {
        mProgram->setCameraGeometryType(static_cast<EglProgram::GeometryType>(type), 0);
        int result = -99;
        EXPECT_EQ(draw(&result), expectedFor(mSrc, type)) << "geometry " << type;
        EXPECT_EQ(result, 0);
    }
    EXPECT_EQ(glGetError(), static_cast<GLenum>(GL_NO_ERROR));
}

TEST_F(EglProgramTest, DefaultOnlyDraws2DAndIgnoresEffects) {
    ASSERT_EQ(mProgram->initialize(21, true), 0);
    EXPECT_EQ(mProgram->getCameraMode(), 10);
    EXPECT_FALSE(mProgram->getPreviewFlip());
    TestFilter filter("vec4 doEffect() { return vec4(1.0); }");
    mProgram->setFilter(&filter);
    EXPECT_EQ(mProgram->getFilter(), nullptr);

    GLuint texture = GlTest_makeTexture2D(W, H, mSrc.data());
    glBindFramebuffer(GL_FRAMEBUFFER, mTarget.framebuffer);
    glActiveTexture(GL_TEXTURE0);
    glBindTexture(GL_TEXTURE_2D, texture);
    normal();
    ASSERT_EQ(mProgram->onDrawFrame(), 0);
    EXPECT_EQ(GlTest_readPixels(W, H), expectedFor(mSrc, EglProgram::GEOMETRY_NORMAL));
    EXPECT_EQ(filter.loads + filter.draws, 0);
    glDeleteTextures(1, &texture);
}

TEST_F(EglProgramTest, FailingEffectIsDroppedAndTheNextFrameIsPassThrough) {
    TestFilter filter("vec4 doEffect() { return vec4(0.0, 0.0, 1.0, 1.0); }");
    filter.drawResult = -1;
    mProgram->setFilter(&filter);
    ASSERT_EQ(mProgram->initialize(10, false), 0);
    GLuint oldProgram = mProgram->getProgramID();
    LogCapture log;
    int result = 0;
    draw(&result);
    EXPECT_EQ(result, -1);
    EXPECT_TRUE(log.contains(VF_LOG_ERROR, "The filter returned -1 from onDrawFrame!"));
    EXPECT_EQ(mProgram->getFilter(), nullptr);
    EXPECT_EQ(filter.releasedWith, nullptr);  // dropped, not released or deleted
    EXPECT_FALSE(glIsProgram(oldProgram));
    normal();
    EXPECT_EQ(draw(&result), expectedFor(mSrc, EglProgram::GEOMETRY_NORMAL));
    EXPECT_EQ(result, 0);
    EXPECT_EQ(filter.draws, 1);
}

TEST_F(EglProgramTest, ReplacingTheEffectReleasesTheOldOneAndReloadsOnTheNextFrame) {
    TestFilter red("vec4 doEffect() { return vec4(1.0, 0.0, 0.0, 1.0); }");
    TestFilter green("vec4 doEffect() { return vec4(0.0, 1.0, 0.0, 1.0); }");
    mProgram->setFilter(&red);
    ASSERT_EQ(mProgram->initialize(10, false), 0);
    Pixels out = draw();
    EXPECT_EQ(out[0], 255);
    EXPECT_EQ(out[1], 0);

    mProgram->setFilter(&green);
    EXPECT_EQ(red.releasedWith, mProgram->getRecycler().get());
    EXPECT_EQ(green.loads, 0);  // nothing happens before the next frame
    out = draw();
    EXPECT_EQ(green.loads, 1);
    for (size_t i = 0; i < out.size(); i += 4) {
        ASSERT_EQ(out[i], 0);
        ASSERT_EQ(out[i + 1], 255);
    }

    // Back to no effect: the pass-through again.
    mProgram->setFilter(nullptr);
    EXPECT_EQ(green.releasedWith, mProgram->getRecycler().get());
    normal();
    EXPECT_EQ(draw(), expectedFor(mSrc, EglProgram::GEOMETRY_NORMAL));
}

TEST_F(EglProgramTest, TwoInputModeUsesTheSecondTemplateAndTheFlipFlag) {
    TestFilter second("vec4 doEffect2() { return texture2D(texSampler2, v_texcoord); }");
    mProgram->setFilter(&second);
    ASSERT_EQ(mProgram->initialize(20, false), 0);
    EXPECT_EQ(draw(), expectedFor(mSrc2, EglProgram::GEOMETRY_VFLIP, true));  // flip set
    ASSERT_EQ(mProgram->setPreviewGeometry(W, H, false), 0);
    // The camera-0 type does not matter with two inputs.
    mProgram->setCameraGeometryType(EglProgram::GEOMETRY_HFLIP, 0);
    EXPECT_EQ(draw(), mSrc2);
}

TEST_F(EglProgramTest, DownloadableEffectSuppliesACompleteShader) {
    TestFilter ext(
        "precision mediump float; varying highp vec2 v_texcoord; void main() { gl_FragColor = "
        "vec4(0.0, 0.0, 1.0, 1.0); }",
        2001);
    mProgram->setFilter(&ext);
    ASSERT_EQ(mProgram->initialize(10, false), 0);
    Pixels out = draw();
    EXPECT_EQ(Pixels(out.begin(), out.begin() + 4), (Pixels{0, 0, 255, 255}));

    TestFilter none(nullptr, 2000);  // yields shader 0
    mProgram->setFilter(&none);
    LogCapture log;
    normal();
    EXPECT_EQ(draw(), expectedFor(mSrc, EglProgram::GEOMETRY_NORMAL));
    EXPECT_EQ(log.countPrefix("VC_ERROR_UNKNOWN (-1): core/egl/EglProgram:"), 1u);
    EXPECT_TRUE(log.contains("GL Error: failed to load effect shader. Loading default."));
}

TEST_F(EglProgramTest, UnlinkableDefaultMeansABlackScreen) {
    TestFilter filter("");
    filter.sabotage = true;
    mProgram->setFilter(&filter);
    LogCapture log;
    EXPECT_EQ(mProgram->initialize(10, false), -1);
    EXPECT_TRUE(log.contains(
        VF_LOG_ERROR,
        "Could not link the default GL program. This is really bad. Screen will go black!"));
    EXPECT_EQ(mProgram->getProgramID(), 0u);
}

TEST_F(EglProgramTest, WithTheDrawFlagClearedTheEffectDrawsAlone) {
    TestFilter filter("");
    filter.selfDrawing = true;
    mProgram->setFilter(&filter);
    ASSERT_EQ(mProgram->initialize(10, false), 0);
    EXPECT_FALSE(mProgram->getDrawFlag());
    Pixels cyan;
    for (int i = 0; i < W * H; i++) cyan.insert(cyan.end(), {0, 255, 255, 255});
    EXPECT_EQ(draw(), cyan);
}

TEST_F(EglProgramTest, TextureUnitsAreHandedOutUpToTheLimit) {
    ASSERT_EQ(mProgram->initialize(10, false), 0);
    GLint units = 0;
    glGetIntegerv(GL_MAX_COMBINED_TEXTURE_IMAGE_UNITS, &units);
    ASSERT_GT(units, 2);
    EXPECT_EQ(mProgram->getMaxAvailableTextures(), units);
    for (int expected = 2; expected <= units; expected++) {
        ASSERT_EQ(mProgram->getNextAvailableTexture(), expected);
    }
    LogCapture log;
    EXPECT_EQ(mProgram->getNextAvailableTexture(), -5);
    EXPECT_EQ(mProgram->getNextAvailableTexture(), -5);
    EXPECT_EQ(
        log.count("EGL Error: Running out of available textures! Please check the filter code!"),
        2u);
    mProgram->resetAvailableTextures();
    EXPECT_EQ(mProgram->getNextAvailableTexture(), 2);
}

}  // namespace
