// Downloadable filters end to end: libraries installed in a temporary device
// tree, loaded by name, driven on the CPU and on llvmpipe through the buffered
// processor. The C stand-in (plugin_standin/) checks the plug-in slot order
// and records every call; the example Solarize is checked against a CPU
// statement of its math.
#include <dlfcn.h>
#include <gtest/gtest.h>
#include <stdlib.h>

#include <algorithm>
#include <fstream>
#include <memory>
#include <string>
#include <vector>

#include "core/KivFilterExternal.h"
#include "core/KivImaging.h"
#include "core/egl/EglProgram.h"
#include "core/egl/EglRecycler.h"
#include "plugin_standin/standin.h"
#include "support/gl_context.h"
#include "support/image_ptr.h"
#include "support/log_capture.h"
#include "support/open_files.h"
#include "support/look_reference.h"
#include "support/plugin_sysroot.h"
#include "support/processor_ptr.h"
#include "vccore/vc_image.h"
#include "vccore/vc_log.h"

namespace {

const std::string kStandin = "com.example.standin,libstandin.so";

std::unique_ptr<KivFilterExternal> makeEffect(const std::string& name) {
    return std::make_unique<KivFilterExternal>(const_cast<char*>(name.c_str()));
}

StandinPlugin* standinOf(KivFilter* effect) {
    auto* external = dynamic_cast<KivFilterExternal*>(effect);
    return external != nullptr ? reinterpret_cast<StandinPlugin*>(external->getPlugin()) : nullptr;
}

std::vector<int> callsOf(const StandinPlugin* p) {
    return std::vector<int>(p->calls, p->calls + std::min(p->callCount, STANDIN_MAX_CALLS));
}

// An opaque test picture and its RGBA pixels.
std::vector<uint8_t> picture(int w, int h) {
    return lookref::makeTestPicture(w, h, true);
}

void clearStandinEnv() {
    for (const char* v : {"KIV_STANDIN_CREATE_NULL", "KIV_STANDIN_CAPS", "KIV_STANDIN_FORMATS"})
        unsetenv(v);
}

class ExternalFilter : public ::testing::Test {
protected:
    void SetUp() override {
        ASSERT_TRUE(mRoot.ok());
        clearStandinEnv();
    }
    void TearDown() override { clearStandinEnv(); }
    std::string root(const std::string& tail) const { return mRoot.root() + tail; }
    PluginSysroot mRoot;
};

TEST_F(ExternalFilter, LoadOutcomesAndTheirLogLines) {
    // The folder a name is looked for in shows by where each is installed.
    const std::string loaded = "I Downloadable Filter, mThirdPartyWrapper is loaded (Standin)";
    const std::string junk = mRoot.downloadLib() + "com.example.junk.libjunk.so";
    const std::string E = "E Downloadable Filter: ";
    struct Case {
        std::string name;
        const char* library;  // installed as the name's file; null: nothing installed
        bool preload, createNull;
        std::string line;  // `loaded` when a plug-in loads
    } cases[] = {
        // clang-format off
        {"com.kiv.android.filter,libstandin.so", KIV_STANDIN_FULL, true, false, loaded},
        // One of the vendor libraries the library knows: the preload folder too.
        {"com.example.filtervendor.alpha,libriddle.so", KIV_STANDIN_FULL, true, false, loaded},
        {kStandin, KIV_STANDIN_FULL, false, false, loaded},
        // Any other package is looked for in the download folder only.
        {"com.example.other,libstandin.so", KIV_STANDIN_FULL, true, false,
         E + mRoot.downloadLib() + "com.example.other.libstandin.so is not opened, No such file or directory"},
        {"com.example.junk,libjunk.so", nullptr, false, false, E + junk + " is not opened, " + junk + ": *"},
        {"com.example.nocreate,libnocreate.so", KIV_STANDIN_NO_CREATE, false, false,
         E + "libnocreate.so dlsym is fail with *"},
        {kStandin, KIV_STANDIN_FULL, false, true, E + "Create() of libstandin.so returned null"},
        {kStandin + ",more", KIV_STANDIN_FULL, false, false,
         E + "refused the effect name \"com.example.standin,libstandin.so,more\": more than one comma"},
        // clang-format on
    };
    std::ofstream(junk) << "not a library";
    const int files = Test_openFiles();
    for (const Case& c : cases) {
        if (c.library != nullptr) {
            const size_t comma = c.name.find(',');
            ASSERT_FALSE(mRoot
                             .install(c.library, c.name.substr(0, comma), c.name.substr(comma + 1),
                                      c.preload)
                             .empty());
        }
        if (c.createNull) setenv("KIV_STANDIN_CREATE_NULL", "1", 1);
        LogCapture log;
        auto effect = makeEffect(c.name);
        unsetenv("KIV_STANDIN_CREATE_NULL");
        EXPECT_TRUE(log.matches({c.line})) << c.name;
        const bool loads = c.line == loaded;
        EXPECT_EQ(loads, effect->hasPlugin()) << c.name;
        EXPECT_EQ(2000, effect->getFilterType());
        EXPECT_STREQ(c.name.c_str(), effect->getPkgAndFileName());
        EXPECT_STREQ(loads ? "Standin" : "", effect->getPluginName());
        EXPECT_EQ(loads ? 3 : 0, effect->getCapabilities()) << c.name;
        EXPECT_EQ(loads ? 5 : 0, effect->getSupportedFormats()) << c.name;
    }
    EXPECT_EQ(files, Test_openFiles());  // no library's descriptor outlives its effect
    // No name at all.
    LogCapture log;
    KivFilterExternal none(nullptr);
    EXPECT_TRUE(
        log.matches({"E Downloadable Filter: The argument does not look like a proper library "
                     "filename: (nul"}));
    EXPECT_EQ(nullptr, none.getPkgAndFileName());
    EXPECT_FALSE(none.hasPlugin());
    // Through the factory and the C API, as processors make it.
    KivFilter* viaApi = KivImaging_create(2000, const_cast<char*>(kStandin.c_str()));
    ASSERT_NE(nullptr, standinOf(viaApi));
    EXPECT_STREQ(kStandin.c_str(), KivImaging_getPkgAndFileName(viaApi));
    KivImaging_destroy(viaApi);
}

TEST_F(ExternalFilter, DestroyUnloadsUnlessTheLibraryCannotFreeItsObject) {
    struct Case {
        const char* library;
        bool createNull, stillLoaded;
        std::vector<std::string> lines;
    } cases[] = {
        // clang-format off
        {KIV_STANDIN_FULL, false, false, {"I Downloadable Filter, Destroy previous filter (Standin)"}},
        {KIV_STANDIN_FULL, true, false, {}},
        // Its object cannot be freed, so its code must stay.
        {KIV_STANDIN_NO_DESTROY, false, true, {"E Downloadable Filter, ~KivFilterExternal loadDestroy fail!"}},
        // clang-format on
    };
    int n = 0;
    for (const Case& c : cases) {
        const std::string package = "com.example.d" + std::to_string(n++);
        const std::string path = mRoot.install(c.library, package, "libd.so");
        if (c.createNull) setenv("KIV_STANDIN_CREATE_NULL", "1", 1);
        auto effect = makeEffect(package + ",libd.so");
        unsetenv("KIV_STANDIN_CREATE_NULL");
        EXPECT_EQ(!c.createNull, effect->hasPlugin());
        LogCapture log;
        effect.reset();
        EXPECT_TRUE(log.matches(c.lines)) << c.library;
        void* handle = dlopen(path.c_str(), RTLD_NOW | RTLD_NOLOAD);
        EXPECT_EQ(c.stillLoaded, handle != nullptr) << c.library;
        if (handle != nullptr) dlclose(handle);
    }
}

TEST_F(ExternalFilter, CpuProcessingStatusesAndFormats) {
    mRoot.install(KIV_STANDIN_FULL, "com.example.standin", "libstandin.so");
    const std::vector<uint8_t> in = picture(6, 4);
    std::vector<uint8_t> out;
    const std::string at = " core/KivFilterExternal:#";
    struct Case {
        const char *caps, *formats;
        int inFormat;   // 0: no input image
        int outHeight;  // output image height (input is 4)
        int processResult, status;
        int pluginFormat;  // what process() must be told; 0: not called
        std::vector<std::string> lines;
    } cases[] = {
        // clang-format off
        {"3", "5", VC_FORMAT_RGBA, 4, 0, 0, 1, {}},
        {"3", "5", VC_FORMAT_NV21, 4, 0, 0, 4, {}},
        {"1", "15", VC_FORMAT_NV12, 4, 0, 0, 8, {}},
        {"1", "15", VC_FORMAT_BGRA, 4, -9, -9, 2, {}},
        {"2", "5", VC_FORMAT_RGBA, 4, 0, -6, 0, {"E VC_ERROR_UNSUPPORTED (-6):" + at}},
        {"3", "5", VC_FORMAT_RGBA, 3, 0, -4, 0, {"E VC_ERROR_INVALID_SIZE (-4):" + at}},
        {"3", "5", 0, 4, 0, -2, 0, {"E VC_ERROR_NULL_PARAM (-2):" + at}},
        // clang-format on
    };
    for (const Case& c : cases) {
        setenv("KIV_STANDIN_CAPS", c.caps, 1);
        setenv("KIV_STANDIN_FORMATS", c.formats, 1);
        auto effect = makeEffect(kStandin);
        StandinPlugin* p = standinOf(effect.get());
        ASSERT_NE(nullptr, p);
        p->processResult = c.processResult;
        out.assign(in.size(), 0);
        if (c.inFormat != 0) {
            ASSERT_EQ(0, effect->setInputImage(in.data(), 6, 4, c.inFormat, 0));
            effect->setOutputImage(out.data(), 6, c.outHeight, c.inFormat, 0);
        }
        LogCapture log;
        EXPECT_EQ(c.status, effect->doEffect()) << c.caps << "/" << c.inFormat;
        EXPECT_TRUE(log.matches(c.lines)) << c.caps;
        EXPECT_EQ(c.pluginFormat, p->processFormat);
        if (c.pluginFormat != 0) {
            EXPECT_EQ(6, p->processWidth);
            EXPECT_EQ(4, p->processHeight);
            EXPECT_EQ(255 - in[7], out[7]);
        }
    }
    // Formats the plug-in lists are the ones an input may have.
    setenv("KIV_STANDIN_FORMATS", "10", 1);  // BGRA | NV12
    auto effect = makeEffect(kStandin);
    for (uint32_t f : {VC_FORMAT_RGBA, VC_FORMAT_BGRA, VC_FORMAT_NV21, VC_FORMAT_NV12,
                       VC_FORMAT_GREY, VC_FORMAT_YV12})
        EXPECT_EQ(f == VC_FORMAT_BGRA || f == VC_FORMAT_NV12, effect->checkSupportFormat(int(f)));
    EXPECT_EQ(-6, effect->setInputImage(in.data(), 6, 4, VC_FORMAT_RGBA, 0));
    // Without a plug-in nothing is accepted, and nothing is processed.
    KivFilterExternal none(const_cast<char*>("com.example.absent,libabsent.so"));
    EXPECT_FALSE(none.checkSupportFormat(int(VC_FORMAT_RGBA)));
    EXPECT_EQ(0, none.setOption("parameter", "x=1"));
    EXPECT_EQ(0, none.setOption("strength", 3));
    LogCapture log;
    EXPECT_EQ(-2, none.doEffect());
    EXPECT_TRUE(log.matches({"E Downloadable Filter, mExtWrapper is null",
                             "E VC_ERROR_NULL_PARAM (-2): core/KivFilterExternal:#"}));
}

class ExternalFilterGl : public ExternalFilter {
protected:
    void SetUp() override {
        ExternalFilter::SetUp();
        mProcessor = ProcessorTest_create();
    }
    // The effect `name` over an opaque w x h picture; RGBA out.
    std::vector<uint8_t> render(const std::string& name, int w, int h,
                                const char* parameter = nullptr) {
        mProcessor->setEffect(name.c_str());
        if (parameter != nullptr) mProcessor->setEffectParameter(parameter);
        std::vector<uint8_t> in = picture(w, h), out(in.size());
        EXPECT_EQ(0, mProcessor->doProcessRGBA(in.data(), w, h, out.data(), VC_FORMAT_RGBA));
        return out;
    }
    ProcessorPtr mProcessor;
};

TEST_F(ExternalFilterGl, StandinDrawsThroughItsSlotsInOrder) {
    mRoot.install(KIV_STANDIN_FULL, "com.example.standin", "libstandin.so");
    const int w = 24, h = 16;
    std::vector<uint8_t> out = render(kStandin, w, h, "tint=2");
    StandinPlugin* p = standinOf(mProcessor->getEffect());
    ASSERT_NE(nullptr, p);
    // getName (load line), capabilities, formats, the parameter, then per
    // picture: draw flag, compile, GL info, draw, and the GL release as the
    // program goes. Slots 1, 2 and 4 are never called.
    EXPECT_EQ((std::vector<int>{3, 10, 11, 13, 5, 7, 6, 8, 14}), callsOf(p));
    EXPECT_STREQ("parameter", p->textOptionName);
    EXPECT_STREQ("tint=2", p->textOptionValue);
    EXPECT_EQ(root("/data/DownFilters/Tex/"), p->textureDirectory);
    EXPECT_STREQ("com.example.standin", p->packageName);
    EXPECT_NE(0u, p->info.programId);
    EXPECT_EQ(2, p->info.textureUnit);
    // The processor builds its program before it knows the picture's size:
    // the plug-in learns it from onDrawFrame.
    EXPECT_EQ((std::vector<int>{0, 0, 0, 0, 1}),
              (std::vector<int>{p->info.cameraWidth, p->info.cameraHeight, p->info.cameraWidth2,
                                p->info.cameraHeight2, p->info.camera0GeometryType}));
    EXPECT_EQ((std::vector<int>{w, h, 0}),
              (std::vector<int>{p->drawWidth, p->drawHeight, p->drawUpsideDown}));
    const std::vector<uint8_t> in = picture(w, h);
    for (size_t i = 0; i < in.size(); ++i)
        ASSERT_NEAR(i % 4 == 3 ? in[i] : 255 - in[i], out[i], 1) << i;
    // The two textures it handed back are gone with the program.
    ASSERT_NE(0u, p->released[0]);
    ASSERT_EQ(0, mProcessor->bindGLEnvironment());
    EXPECT_FALSE(glIsTexture(p->released[0]) || glIsTexture(p->released[1]));
    const unsigned int first = KivFilterExternal::getFirstProgramId();
    EXPECT_NE(0u, first);
    // A second picture reuses the first program and leaves no GL object behind.
    const int objects = GlTest_liveObjects(4096);
    mProcessor->unbindGLEnvironment();
    render(kStandin, w, h);
    EXPECT_EQ(first, KivFilterExternal::getFirstProgramId());
    ASSERT_EQ(0, mProcessor->bindGLEnvironment());
    EXPECT_EQ(objects, GlTest_liveObjects(4096)) << "GL objects left behind per picture";
    mProcessor->unbindGLEnvironment();
}

// Every way a plug-in can fail ends in the pass-through picture.
TEST_F(ExternalFilterGl, FailuresEndInThePassThrough) {
    mRoot.install(KIV_STANDIN_FULL, "com.example.standin", "libstandin.so");
    const std::string returned = "E|The filter returned ",
                      fallback = "E|GL Error: failed to load effect shader. Loading default.";
    struct Case {
        const char* label;
        std::string name;
        const char* env;  // a variable set to "1" while loading
        int compileMode;
        std::vector<std::string> mustLog;
    } cases[] = {
        // clang-format off
        {"missing", "com.example.absent,libabsent.so", nullptr, 0,
         {"E|Downloadable Filter, mExtWrapper is null", "E|Downloadable Filter, mThirdPartyWrapper is null",
          returned + "1 from onDrawFrame!"}},
        {"create null", kStandin, "KIV_STANDIN_CREATE_NULL", 0, {returned + "1 from onDrawFrame!"}},
        {"cpu only", kStandin, "KIV_STANDIN_CAPS", 0, {returned + "-6 from onDrawFrame!"}},
        {"no compile", kStandin, nullptr, STANDIN_COMPILE_FAIL,
         {"E|Downloadable Filter, compile fragment shader failed", fallback}},
        {"no link", kStandin, nullptr, STANDIN_COMPILE_NOLINK, {"E|GL Error: Program failed to link.", fallback}},
        // clang-format on
    };
    const int w = 20, h = 12;
    const std::vector<uint8_t> in = picture(w, h);
    for (const Case& c : cases) {
        if (c.env != nullptr) setenv(c.env, "1", 1);
        mProcessor->setEffect(c.name.c_str());
        clearStandinEnv();
        ASSERT_EQ(2000, mProcessor->getEffect()->getFilterType());
        if (StandinPlugin* p = standinOf(mProcessor->getEffect())) p->compileMode = c.compileMode;
        std::vector<uint8_t> out(in.size());
        LogCapture log;
        ASSERT_EQ(0, mProcessor->doProcessRGBA(in.data(), w, h, out.data(), VC_FORMAT_RGBA));
        for (const std::string& line : c.mustLog)
            EXPECT_TRUE(log.contains(line[0] == 'E' ? VF_LOG_ERROR : VF_LOG_DEBUG, line.substr(2)))
                << c.label << ": " << line;
        for (size_t i = 0; i < in.size(); ++i)
            ASSERT_EQ(i % 4 == 3 ? 255 : in[i], out[i]) << c.label << " byte " << i;
    }
}

TEST_F(ExternalFilterGl, GlInfoGeometryAndRelease) {
    mRoot.install(KIV_STANDIN_FULL, "com.example.standin", "libstandin.so");
    ASSERT_EQ(0, mProcessor->bindGLEnvironment());  // a current context
    struct Case {
        int mode, status;
        std::vector<std::string> lines;
        int extents[4];      // given to the program
        int infoExtents[4];  // what the plug-in is told
    } cases[] = {
        // Missing third and fourth extents: the program fills in the width
        // for both, the plug-in is told what the program holds.
        // clang-format off
        {STANDIN_RELEASE_OK, 0, {}, {40, 30, 0, 0}, {40, 30, 40, 40}},
        {STANDIN_RELEASE_ERROR, 7, {}, {40, 30, 7, 9}, {40, 30, 7, 9}},
        {STANDIN_RELEASE_NULL, -2, {"E VC_ERROR_NULL_PARAM (-2): core/KivFilterExternal:#"}, {8, 6, 0, 0}, {8, 6, 8, 8}},
        {STANDIN_RELEASE_NEGATIVE, -3, {"E VC_ERROR_INVALID_PARAM (-3): core/KivFilterExternal:#"}, {8, 6, 0, 0}, {8, 6, 8, 8}},
        // clang-format on
    };
    for (const Case& c : cases) {
        auto effect = makeEffect(kStandin);
        StandinPlugin* p = standinOf(effect.get());
        android::sp<EglProgram> program = new EglProgram();
        program->setFilter(effect.get());
        program->setCameraGeometry(c.extents[0], c.extents[1], c.extents[2], c.extents[3]);
        ASSERT_EQ(0, program->initialize(10, false));
        EXPECT_EQ(std::vector<int>(c.infoExtents, c.infoExtents + 4),
                  (std::vector<int>{p->info.cameraWidth, p->info.cameraHeight, p->info.cameraWidth2,
                                    p->info.cameraHeight2}));
        // Told the program's geometry when built, then each change once.
        program->setCameraGeometryType(EglProgram::GEOMETRY_HFLIP, 0);
        LogCapture log;
        EXPECT_EQ(0, effect->onDrawFrame(*program));
        EXPECT_EQ(0, effect->onDrawFrame(*program));
        EXPECT_TRUE(log.matches(
            {"I Downloadable Filter, Change GeometryType from 0 to 3, upsideDown = 1"}));
        EXPECT_STREQ("Camera0GeometryType", p->intOptionName);
        EXPECT_EQ(3, p->intOptionValue);
        const unsigned int made[2] = {p->textures[0], p->textures[1]};
        ASSERT_TRUE(glIsTexture(made[0]) && glIsTexture(made[1]));
        p->releaseMode = c.mode;
        android::sp<EglRecycler> recycler = new EglRecycler();
        log.clear();
        EXPECT_EQ(c.status, effect->releaseGL(*recycler)) << c.mode;
        EXPECT_TRUE(log.matches(c.lines)) << c.mode;
        recycler->recycle();
        EXPECT_EQ(c.mode != STANDIN_RELEASE_OK, glIsTexture(made[0]) && glIsTexture(made[1]));
        if (c.mode != STANDIN_RELEASE_OK) glDeleteTextures(2, made);
        program->setFilter(nullptr);
        program->release();
    }
    // Without a plug-in: nothing drawn (the program then drops the effect),
    // nothing to release.
    KivFilterExternal none(const_cast<char*>("com.example.absent,libabsent.so"));
    android::sp<EglProgram> program = new EglProgram();
    ASSERT_EQ(0, program->initialize(10, false));
    EXPECT_EQ(1, none.onDrawFrame(*program));
    EXPECT_EQ(0, none.releaseGL(*program->getRecycler()));
    program->release();
    mProcessor->unbindGLEnvironment();
}

struct SolarizeCase {
    uint32_t format;
    int width, height;
};

class SolarizeOnTheCpu : public ExternalFilter,
                         public ::testing::WithParamInterface<SolarizeCase> {};

TEST_P(SolarizeOnTheCpu, ProcessesBuffersThroughTheEffectApi) {
    const SolarizeCase& c = GetParam();
    ASSERT_FALSE(
        mRoot.install(KIV_EXAMPLE_SOLARIZE, "com.example.solarize", "libsolarize.so").empty());
    KivFilter* f =
        KivImaging_create(2000, const_cast<char*>("com.example.solarize,libsolarize.so"));
    ASSERT_NE(nullptr, f);
    const size_t size = VCImage_requiredSize(c.width, c.height, c.format);
    std::vector<uint8_t> in(size), out(size, 0);
    for (size_t i = 0; i < size; ++i) in[i] = uint8_t(i * 37 + i / 7);
    ASSERT_EQ(0, KivImaging_setInputImage(f, in.data(), c.width, c.height, int(c.format), 0));
    ASSERT_EQ(0, KivImaging_setOutputImage(f, out.data(), c.width, c.height, int(c.format), 0));
    const bool packed = c.format == VC_FORMAT_RGBA || c.format == VC_FORMAT_BGRA;
    const size_t luma = size_t(c.width) * c.height;
    // Default threshold, then by integer option, then by parameter string.
    for (int threshold : {128, 200, 60}) {
        if (threshold == 200) {
            EXPECT_EQ(1, KivImaging_setOptionByNameI(f, "threshold", 200));
        } else if (threshold == 60) {
            EXPECT_EQ(1, KivImaging_setOptionByNameS(f, "parameter", "threshold=60"));
        }
        ASSERT_EQ(0, KivImaging_doEffect(f));
        for (size_t i = 0; i < size; ++i) {
            const bool colour = packed ? i % 4 != 3 : i < luma;
            const int want = colour && in[i] >= threshold ? 255 - in[i] : in[i];
            ASSERT_EQ(want, out[i]) << "byte " << i << " threshold " << threshold;
        }
    }
    KivImaging_destroy(f);
}

INSTANTIATE_TEST_SUITE_P(Formats, SolarizeOnTheCpu,
                         ::testing::Values(SolarizeCase{VC_FORMAT_RGBA, 16, 8},
                                           SolarizeCase{VC_FORMAT_BGRA, 33, 17},
                                           SolarizeCase{VC_FORMAT_NV21, 16, 8},
                                           SolarizeCase{VC_FORMAT_NV21, 33, 17},
                                           SolarizeCase{VC_FORMAT_NV12, 34, 18}));

}  // namespace
