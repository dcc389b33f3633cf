// An image on the GPU: a 2D texture (optionally with a framebuffer around it)
// that effects sample or render into, or an image whose storage is a
// GraphicBuffer, so the CPU can write camera pixels into an external texture
// or read rendered pixels from a framebuffer without a GL copy.
#ifndef CORE_EGL_EGLIMAGE_H
#define CORE_EGL_EGLIMAGE_H

#include <stdint.h>

#include <EGL/egl.h>
#include <EGL/eglext.h>
#include <GLES2/gl2.h>
#include <utils/StrongPointer.h>

#include "core/egl/EglEnvironment.h"
#include "core/egl/EglObject.h"
#include "vccore/vc_image.h"

namespace android {
class GraphicBuffer;
}

class EglImage : public EglObject {
public:
    enum IMAGE_TYPE {
        IMAGE_TEXTURE = 0,               // GL_TEXTURE_2D filled by setImageData
        IMAGE_FRAMEBUFFER = 1,           // RGBA GL_TEXTURE_2D inside a framebuffer
        IMAGE_EXTERNAL = 2,              // GL_TEXTURE_EXTERNAL_OES over a GraphicBuffer
        IMAGE_EXTERNAL_FRAMEBUFFER = 3,  // framebuffer whose colour buffer is an RGBA GraphicBuffer
    };

    EglImage(IMAGE_TYPE type, int width, int height);
    EglImage(const android::sp<EglEnvironment>& env, IMAGE_TYPE type, int width, int height);
    EglImage(const android::sp<EglEnvironment>& env, IMAGE_TYPE type, int width, int height,
             int format);
    virtual ~EglImage();

    int onDrawFrame() override;

    int bindTexture();
    int unbindTexture();
    int bindFrameBuffer();
    int unbindFrameBuffer();

    // width x height RGBA bytes into a 2D texture; sampleType is the wrap mode.
    int setImageData(const unsigned char* data, int sampleType);
    // Uploads (2D types) or writes (GraphicBuffer types) an image, converting
    // or resizing YUV as needed.
    int setImageData(const VCImage& image, int sampleType);
    // The pixels of a render target, or null; the caller destroys the record.
    // Type 1: a copy read from GL. Types 2 and 3: the buffer's own memory,
    // which stays locked for reading until the record is destroyed.
    VCImage* getImageData();
    // Makes pending GPU work on a render target land (and, for a
    // GraphicBuffer, in the CPU's view of it).
    int flushCache();
    GLuint getTextureID() const { return mTexture; }

    // Nearest-neighbour resize of a compact image in the buffer's YUV format.
    void doTransformResizeYUV(unsigned char* dst, int dstWidth, int dstHeight, unsigned char* src,
                              int srcWidth, int srcHeight);

    IMAGE_TYPE getType() const { return mType; }
    uint32_t getFormat() const { return mFormat; }
    GLuint getFrameBufferID() const { return mFrameBuffer; }
    GLuint getRenderBufferID() const { return mRenderBuffer; }
    bool isInitialized() const { return mInitialized; }
    const android::sp<android::GraphicBuffer>& getGraphicBuffer() const { return mGraphicBuffer; }

protected:
    void release_l() override;
    int initialize_l() override;

private:
    // What differs between the two kinds of storage: GL's own texture (types
    // 0 and 1) or a GraphicBuffer (types 2 and 3). Stateless, one of each.
    class Kind;
    class TextureKind;
    class BufferKind;
    const Kind& kind() const;
    // Binds the 2D texture with linear filters and the given wrap mode.
    bool bindForUpload(int sampleType);
    // Binds `name` (mTexture or 0) to the kind's texture target.
    int bindTextureName(GLuint name, const char* notInitialized);

    IMAGE_TYPE mType;
    uint32_t mFormat;
    android::sp<android::GraphicBuffer> mGraphicBuffer;
    android::sp<EglEnvironment> mEglEnv;
    GLuint mTexture;
    GLuint mFrameBuffer;
    GLuint mRenderBuffer;
    EGLImageKHR mEglImage;
    bool mInitialized;
};

#endif
