// Beauty at 1920x1080 with one face, per frame, through an EglProgram that
// lives across frames as on the live preview, against the bare GL work of the
// same passes done here in the same context: the horizontal blur of the camera
// into a quarter-size target, the vertical blur into a second one, the compose
// into the frame (the three passes Beauty draws with a face), with the same
// shader texts, textures and uniform values. A second pair times the frame
// without a face: Beauty's copy pass against one bare copy draw. Both sides
// finish each frame (glFinish) and take turns in rounds of frames, so load
// from elsewhere on the machine falls on both; the ratio is the median of the
// per-round ratios, with their range. The two outputs are compared first.
#include <GLES2/gl2.h>
#include <GLES2/gl2ext.h>
#include <android/log.h>
#include <benchmark/benchmark.h>
#include <stdio.h>

#include <stdlib.h>

#include <algorithm>
#include <chrono>
#include <cmath>
#include <map>
#include <utility>
#include <string>
#include <vector>

#include "bench_common.h"
#include "bench_gl.h"
#include "core/egl/EglEnvironment.h"
#include "core/egl/EglImage.h"
#include "core/egl/EglNativeSeam.h"
#include "core/egl/EglProgram.h"
#include "core/egl/EglShader.h"
#include "core/egl/EglWindowSurface.h"
#include "core/filters/sce/beauty.h"
#include "vccore/vc_image.h"
#include "vccore/vc_log.h"

namespace {

using namespace kivbench;

constexpr int kWidth = 1920;
constexpr int kHeight = 1080;
constexpr int kRounds = 9;
constexpr int kFramesPerRound = 8;
const char kFace[] =
    "face=1,intensity=3,width=1920,height=1080,left=660,top=240,right=1260,bottom=900,"
    "tonemin=7360576,tonemax=16771288";

double now() {
    return std::chrono::duration<double>(std::chrono::steady_clock::now().time_since_epoch())
        .count();
}

// A camera-like frame: gradients, a skin-toned oval with texture, sharp edges.
VCImage* makeFrame() {
    VCImage* image = VCImage_createNew(kWidth, kHeight, VC_FORMAT_RGBA);
    for (int y = 0; y < kHeight; ++y) {
        for (int x = 0; x < kWidth; ++x) {
            uint8_t* p = image->data + (size_t(y) * kWidth + x) * 4;
            float u = float(x) / kWidth, v = float(y) / kHeight;
            float ex = (u - 0.5f) / 0.18f, ey = (v - 0.5f) / 0.32f;
            bool face = ex * ex + ey * ey < 1.0f;
            float grain = 12.0f * std::sin(x * 0.3f) * std::sin(y * 0.27f);
            p[0] = uint8_t(face ? 220 + grain * 0.5f : 255 * u);
            p[1] = uint8_t(face ? 170 + grain * 0.5f : 255 * v);
            p[2] = uint8_t(face ? 140 + grain * 0.4f : ((x / 64 + y / 64) % 2) * 200);
            p[3] = 255;
        }
    }
    return image;
}

// The same passes, with nothing around them.
class BareBeauty {
public:
    bool open(const Beauty& beauty, const Beauty::State& state, GLuint target) {
        mState = state;
        mTarget = target;
        for (int type = 0; type < 4; ++type) {
            mPrograms[type] = quadProgram(beauty.getFragmentShader(Beauty::BLUR_TYPE(type)));
            if (mPrograms[type] == 0) return false;
        }
        for (int i = 0; i < 2; ++i) {
            glGenTextures(1, &mTextures[i]);
            glBindTexture(GL_TEXTURE_2D, mTextures[i]);
            glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MIN_FILTER, GL_LINEAR);
            glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_MAG_FILTER, GL_LINEAR);
            glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_S, GL_CLAMP_TO_EDGE);
            glTexParameteri(GL_TEXTURE_2D, GL_TEXTURE_WRAP_T, GL_CLAMP_TO_EDGE);
            glTexImage2D(GL_TEXTURE_2D, 0, GL_RGBA, kWidth / 4, kHeight / 4, 0, GL_RGBA,
                         GL_UNSIGNED_BYTE, nullptr);
            glGenFramebuffers(1, &mFramebuffers[i]);
            glBindFramebuffer(GL_FRAMEBUFFER, mFramebuffers[i]);
            glFramebufferTexture2D(GL_FRAMEBUFFER, GL_COLOR_ATTACHMENT0, GL_TEXTURE_2D,
                                   mTextures[i], 0);
        }
        glBindTexture(GL_TEXTURE_2D, 0);
        return glGetError() == GL_NO_ERROR;
    }

    void close() {
        for (GLuint p : mPrograms) glDeleteProgram(p);
        glDeleteTextures(2, mTextures);
        glDeleteFramebuffers(2, mFramebuffers);
    }

    // Locations are looked up once, as any hand-written renderer would.
    GLint loc(GLuint program, const char* name) {
        auto key = std::make_pair(program, std::string(name));
        auto it = mLocations.find(key);
        if (it != mLocations.end()) return it->second;
        GLint l = name[0] == 'a' && name[1] == '_' ? glGetAttribLocation(program, name)
                                                   : glGetUniformLocation(program, name);
        mLocations[key] = l;
        return l;
    }

    void pass(GLuint program, GLuint framebuffer, int w, int h, const float* texcoords) {
        glBindFramebuffer(GL_FRAMEBUFFER, framebuffer);
        glViewport(0, 0, w, h);
        glClear(GL_COLOR_BUFFER_BIT);
        glUseProgram(program);
        GLint position = loc(program, "a_position");
        GLint texcoord = loc(program, "a_texcoord");
        glVertexAttribPointer(position, 3, GL_FLOAT, GL_FALSE, 0, EglProgram::kVertices);
        glEnableVertexAttribArray(position);
        glVertexAttribPointer(texcoord, 2, GL_FLOAT, GL_FALSE, 0, texcoords);
        glEnableVertexAttribArray(texcoord);
    }

    void draw() { glDrawArrays(GL_TRIANGLE_STRIP, 0, 4); }

    // Camera texture on unit 0; the frame as Beauty draws it with a face.
    void frameWithFace() {
        const float* normal = EglProgram::kTexCoords[EglProgram::GEOMETRY_NORMAL];
        const float* mirrored = EglProgram::kTexCoords[EglProgram::GEOMETRY_VFLIP];
        GLuint h = mPrograms[1], v = mPrograms[2], c = mPrograms[3];
        pass(h, mFramebuffers[0], kWidth / 4, kHeight / 4, normal);
        glUniform1i(loc(h, "texSampler"), 0);
        glUniform1fv(loc(h, "weight"), 10, mState.weight);
        glUniform2fv(loc(h, "offset"), 10, &mState.offsetH[0][0]);
        draw();
        pass(v, mFramebuffers[1], kWidth / 4, kHeight / 4, normal);
        glActiveTexture(GL_TEXTURE2);
        glBindTexture(GL_TEXTURE_2D, mTextures[0]);
        glUniform1i(loc(v, "texSampler"), 2);
        glUniform1fv(loc(v, "weight"), 10, mState.weight);
        glUniform2fv(loc(v, "offset"), 10, &mState.offsetV[0][0]);
        draw();
        pass(c, mTarget, kWidth, kHeight, mirrored);
        glBindTexture(GL_TEXTURE_2D, mTextures[1]);
        glUniform1i(loc(c, "texSampler"), 0);
        glUniform1i(loc(c, "blurSampler"), 2);
        glUniform3fv(loc(c, "skinToneMin"), 3, &mState.skinToneMin[0][0]);
        glUniform3fv(loc(c, "skinToneMax"), 3, &mState.skinToneMax[0][0]);
        glUniform4fv(loc(c, "facecoord"), 3, &mState.facecoord[0][0]);
        const float identity[4] = {1, 1, 0, 0};
        glUniform4fv(loc(c, "blurTransform"), 1, identity);
        draw();
        glBindTexture(GL_TEXTURE_2D, 0);
        glActiveTexture(GL_TEXTURE0);
    }

    void frameWithoutFace() {
        pass(mPrograms[0], mTarget, kWidth, kHeight,
             EglProgram::kTexCoords[EglProgram::GEOMETRY_NORMAL]);
        glUniform1i(loc(mPrograms[0], "texSampler"), 0);
        draw();
    }

private:
    Beauty::State mState;
    GLuint mTarget = 0;
    GLuint mPrograms[4] = {};
    GLuint mTextures[2] = {};
    GLuint mFramebuffers[2] = {};
    std::map<std::pair<GLuint, std::string>, GLint> mLocations;
};

std::vector<uint8_t> readTarget(GLuint framebuffer) {
    std::vector<uint8_t> pixels(size_t(kWidth) * kHeight * 4);
    glBindFramebuffer(GL_FRAMEBUFFER, framebuffer);
    glReadPixels(0, 0, kWidth, kHeight, GL_RGBA, GL_UNSIGNED_BYTE, pixels.data());
    return pixels;
}

int maxDifference(const std::vector<uint8_t>& a, const std::vector<uint8_t>& b) {
    int worst = 0;
    for (size_t i = 0; i < a.size(); ++i) worst = std::max(worst, std::abs(a[i] - b[i]));
    return worst;
}

struct Pair {
    std::vector<double> ours, bare, ratios;
};
Pair gFace, gNoFace;
int gDifference = -1, gNoFaceDifference = -1;
bool gFailed = false;

void BM_Beauty_OursAndBare(benchmark::State& state) {
    android::sp<EglEnvironment> env = new EglEnvironment();
    android::sp<EglWindowSurface> surface = new EglWindowSurface(env);
    if (env->initialize() != 0 || surface->initialize() != 0 || surface->bindSurface() != 0) {
        state.SkipWithError("no EGL context");
        gFailed = true;
        return;
    }
    VCImage* frame = makeFrame();
    android::sp<EglImage> camera =
        new EglImage(env, EglImage::IMAGE_EXTERNAL, kWidth, kHeight, VC_FORMAT_RGBA);
    android::sp<EglImage> target = new EglImage(EglImage::IMAGE_FRAMEBUFFER, kWidth, kHeight);
    glActiveTexture(GL_TEXTURE0);
    bool ok = camera->initialize() == 0 && camera->bindTexture() == 0 &&
              camera->setImageData(*frame, GL_CLAMP_TO_EDGE) == 0 && target->initialize() == 0;
    Beauty beauty, noFace;
    beauty.setOption("parameter", kFace);
    android::sp<EglProgram> program = new EglProgram(), plain = new EglProgram();
    for (auto* p : {&program, &plain}) {
        (*p)->setCameraGeometryType(EglProgram::GEOMETRY_NORMAL, 0);
        (*p)->setFilter(p == &program ? static_cast<KivFilter*>(&beauty) : &noFace);
        ok = ok && (*p)->initialize(10, false) == 0;
        (*p)->setCameraGeometry(kWidth, kHeight, 0, 0);
        (*p)->setPreviewGeometry(kWidth, kHeight, true);
    }
    auto oursFrame = [&](EglProgram& p) {
        target->bindFrameBuffer();
        camera->bindTexture();
        p.onDrawFrame();
        glFinish();
    };
    // One frame first: it builds the programs and blur targets, and gives the
    // state (weights and offsets for this size) the bare side draws with.
    oursFrame(*program);
    oursFrame(*plain);
    BareBeauty bare;
    ok = ok && beauty.hasBlurTargets() &&
         bare.open(beauty, beauty.getState(), target->getFrameBufferID());
    if (!ok) {
        state.SkipWithError("could not set up the frame");
        gFailed = true;
    }
    auto bareFrame = [&](bool face) {
        camera->bindTexture();
        face ? bare.frameWithFace() : bare.frameWithoutFace();
        glFinish();
    };
    if (ok) {
        oursFrame(*program);
        std::vector<uint8_t> a = readTarget(target->getFrameBufferID());
        bareFrame(true);
        gDifference = maxDifference(a, readTarget(target->getFrameBufferID()));
        oursFrame(*plain);
        a = readTarget(target->getFrameBufferID());
        bareFrame(false);
        gNoFaceDifference = maxDifference(a, readTarget(target->getFrameBufferID()));
    }
    for (auto _ : state) {
        if (!ok) break;
        for (Pair* pair : {&gFace, &gNoFace}) {
            const bool face = pair == &gFace;
            double t0 = now();
            for (int i = 0; i < kFramesPerRound; ++i) oursFrame(face ? *program : *plain);
            double t1 = now();
            for (int i = 0; i < kFramesPerRound; ++i) bareFrame(face);
            double t2 = now();
            pair->ours.push_back((t1 - t0) / kFramesPerRound);
            pair->bare.push_back((t2 - t1) / kFramesPerRound);
            pair->ratios.push_back((t1 - t0) / (t2 - t1));
        }
    }
    bare.close();
    for (auto* p : {&program, &plain}) {
        (*p)->setFilter(nullptr);
        (*p)->getRecycler()->recycle();
        (*p)->release();
    }
    target->release();
    camera->release();
    VCImage_destroy(frame);
    surface->unbindSurface();
    surface->release();
    env->release();
}

BENCHMARK(BM_Beauty_OursAndBare)->Iterations(kRounds)->Unit(benchmark::kMillisecond)->UseRealTime();

void report(const char* name, const Pair& p, const char* target) {
    auto range = std::minmax_element(p.ratios.begin(), p.ratios.end());
    printf("%s 1920x1080: ours %.2f ms, bare %.2f ms per frame (medians of %zu rounds of %d)\n",
           name, median(p.ours) * 1e3, median(p.bare) * 1e3, p.ratios.size(), kFramesPerRound);
    printf("ratio %s ours/bare = %.2f (per-round range %.2f-%.2f%s)\n", name, median(p.ratios),
           *range.first, *range.second, target);
}

}  // namespace

int main(int argc, char** argv) {
    quietHeadless();
    benchmark::Initialize(&argc, argv);
    benchmark::RunSpecifiedBenchmarks();
    benchmark::Shutdown();
    if (gFailed || gFace.ratios.empty()) {
        fprintf(stderr, "bench_beauty: the frames could not be drawn; no ratio\n");
        return 1;
    }
    printf("  ours vs bare output: largest difference %d (with a face), %d (without)\n",
           gDifference, gNoFaceDifference);
    if (gDifference != 0 || gNoFaceDifference != 0) {
        fprintf(stderr, "bench_beauty: the two sides drew different frames; no ratio\n");
        return 1;
    }
    report("beauty", gFace, "; target <= 1.15");
    report("beauty_noface", gNoFace, "");
    return 0;
}
