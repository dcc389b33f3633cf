// Smooths skin inside the face the camera's face detector reports. The frame
// is blurred at a quarter of the preview size (horizontal pass from the camera
// into target A, vertical pass from A into target B), and a compose pass mixes
// the sharp frame with the blurred one inside an ellipse around the face, where
// the pixel's colour lies in the face's skin-tone range. With no face, or
// intensity 0, one copy pass draws the camera frame unchanged.
//
// Faces come through the "parameter" text: "face" (which face this text
// describes, 1 to 3; 0 for none), "intensity" (0 to 4), the frame size
// "width" and "height", the face rectangle "left", "top", "right", "bottom" in
// that frame (y down), and the skin colour range "tonemin" and "tonemax" as
// 0xRRGGBB values written in decimal.
#ifndef KIV_CORE_FILTERS_SCE_BEAUTY_H
#define KIV_CORE_FILTERS_SCE_BEAUTY_H

#include <utils/RefBase.h>

#include <mutex>
#include <string>

#include "core/KivParameterOption.h"
#include "core/KivPixelReach.h"
#include "core/egl/EglImage.h"
#include "core/egl/EglShader.h"

class Beauty : public KivFilterWithOptions<Beauty>,
               public KivParameterKeys,
               public KivPixelReachSource {
public:
    static const int kType = 446;
    enum BLUR_TYPE { BLUR_COPY = 0, BLUR_HORIZONTAL = 1, BLUR_VERTICAL = 2, BLUR_COMPOSE = 3 };
    static const int kTaps = 10;
    static const int kFaces = 3;
    static const char kEffectName[];
    static const char* const kParameterKeys[];

    // Everything a frame is drawn from (a copy, for a frame and for tests).
    struct State {
        int intensity;
        int faceCount;
        float facecoord[kFaces][4];  // centre x, centre y, scale x, scale y
        float skinToneMin[kFaces][3];
        float skinToneMax[kFaces][3];
        float weight[kTaps];
        float offsetH[kTaps][2];
        float offsetV[kTaps][2];
        int blurWidth;
        int blurHeight;
    };

    Beauty();
    // Releases what releaseGL never took; that needs the GL context current.
    ~Beauty() override;

    static KivFilterOptionTable& optionTable();

    int doEffect() override { return VC_ERROR_UNSUPPORTED; }
    int getFilterType() const override { return kType; }
    // Builds the four programs; the effect draws by itself.
    int loadPartialFragmentShader(EglProgram& program, const char* header,
                                  unsigned int& shaderId) override;
    int onDrawFrame(EglProgram& program) override;
    // The programs and both blur targets go to the recycler.
    int releaseGL(EglRecycler& recycler) override;
    using KivFilter::setOption;
    // Logs the text and returns 1 for every name; only "parameter" changes
    // anything.
    int setOption(const char* name, const char* value) override;

    const char* const* parameterKeys() const override { return kParameterKeys; }
    // The blur runs on a quarter-size grid laid over the whole frame.
    KivPixelReach pixelReach(int, int) const override { return {KivPixelReach::WHOLE_PICTURE, 0}; }

    // 1 horizontal blur (camera sampler), 2 vertical blur (2D sampler),
    // 3 compose, anything else the copy.
    const char* getFragmentShader(BLUR_TYPE type) const;
    const char* getVertexShader() const;

    State getState() const;
    // Whether the programs and the blur targets exist.
    bool hasPrograms() const;
    bool hasBlurTargets() const { return mBlurA != nullptr && mBlurB != nullptr; }

private:
    static void computeBlurTable(State& state);
    void releaseTargets();
    int drawQuad(EglShader& shader, const float* texcoords);
    int rebuildTargets(EglProgram& program, int blurWidth, int blurHeight);

    android::sp<EglShader> mPrograms[4];
    android::sp<EglImage> mBlurA;
    android::sp<EglImage> mBlurB;
    bool mFlip = false;  // the program's flip flag at the last rebuild
    State mState;
    mutable std::mutex mLock;  // guards mState: options arrive from client threads
    std::string mBlurShaders[2];
    std::string mComposeShader;
};

#endif
