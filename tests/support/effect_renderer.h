// Draws effects over a picture through one long-lived EglProgram, as a live
// pipeline does between frames: a picture-sized external texture (GL_LINEAR,
// as the library's images sample) in, a picture-sized target out, the
// identity texture mapping. Needs a current GL context for its whole life.
#ifndef KIV_TESTS_EFFECT_RENDERER_H
#define KIV_TESTS_EFFECT_RENDERER_H

#include <utils/RefBase.h>

#include <cstdint>
#include <vector>

#include "support/gl_context.h"
#include "support/look_reference.h"

class EglProgram;
class KivFilter;

class EffectRenderer {
public:
    explicit EffectRenderer(const lookref::Picture& picture);
    // Detaches the current effect (its GL objects go to the recycler, which
    // runs), then frees the program, the texture and the target. Effects
    // drawn must still exist then.
    ~EffectRenderer();
    bool ok() const { return mOk; }

    // Sets `effect` on the program when it is not the current one (the old
    // one's GL objects go to the recycler) and draws one frame: onDrawFrame's
    // result.
    int draw(KivFilter* effect);
    // The target, row 0 = picture row 0.
    std::vector<uint8_t> pixels() const;
    EglProgram& program() { return *mProgram; }

    EffectRenderer(const EffectRenderer&) = delete;
    EffectRenderer& operator=(const EffectRenderer&) = delete;

private:
    int mWidth;
    int mHeight;
    GlExternalTexture mTexture;
    GlTarget mTarget;
    android::sp<EglProgram> mProgram;
    KivFilter* mEffect = nullptr;
    bool mOk = false;
};

// A program with the default shader and the identity mapping over a width x
// height camera and preview; null (nothing left behind) when it cannot be made.
android::sp<EglProgram> EffectRenderer_identityProgram(int width, int height);

// One frame of `effect` over `picture` with a program of its own; empty
// pixels when the GL objects could not be made. `drawResult` (optional)
// receives onDrawFrame's result.
std::vector<uint8_t> EffectRenderer_renderOnce(KivFilter* effect, const lookref::Picture& picture,
                                               int* drawResult = nullptr);

#endif
