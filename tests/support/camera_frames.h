// Camera frames in tests: what the virtual camera's generator sends, as the
// image core converts it (the reference for anything drawn from it), and a
// drawer that samples an external texture through the library's program
// (default external shader, identity mapping) into a target of the same
// size. The drawer needs a current GL context for its whole life.
#ifndef KIV_TESTS_SUPPORT_CAMERA_FRAMES_H
#define KIV_TESTS_SUPPORT_CAMERA_FRAMES_H

#include <GLES2/gl2.h>
#include <utils/StrongPointer.h>

#include <cstdint>
#include <vector>

#include "support/gl_context.h"

class EglProgram;

// The generator's frame `index` at width x height: NV21, and RGBA (rows top
// first) by the image core's full-range conversion.
std::vector<uint8_t> CameraFrames_nv21(uint64_t index, int width, int height);
std::vector<uint8_t> CameraFrames_rgba(uint64_t index, int width, int height);

class ExternalTextureDrawer {
public:
    ExternalTextureDrawer(int width, int height);
    ~ExternalTextureDrawer();
    bool ok() const { return mOk; }
    // Draws `texture` (GL_TEXTURE_EXTERNAL_OES, unit 0); row 0 of the result
    // is row 0 of the frame. Empty when it could not draw.
    std::vector<uint8_t> draw(GLuint texture);
    ExternalTextureDrawer(const ExternalTextureDrawer&) = delete;
    ExternalTextureDrawer& operator=(const ExternalTextureDrawer&) = delete;

private:
    int mWidth, mHeight;
    GlTarget mTarget;
    android::sp<EglProgram> mProgram;
    bool mOk = false;
};

#endif
