// The consumer that latches queued frames into a GL texture (an external
// texture on a device): updateTexImage() takes the oldest queued frame and
// binds an EGL image over its buffer to the texture, giving the previous
// frame back to the queue behind a fence. On a host the image is made from
// the buffer's GPU mirror, so YUV frames sample as RGBA converted with the
// image core's full-range equations.
//
// GL calls need the context the consumer is attached to to be current: the
// first updateTexImage() adopts the current one; detachFromContext() deletes
// the texture and lets the context go, attachToContext() adopts the current
// context with a new texture.
#ifndef KIV_HOST_GUI_GLCONSUMER_H
#define KIV_HOST_GUI_GLCONSUMER_H

#include <EGL/egl.h>
#include <EGL/eglext.h>
#include <gui/BufferQueue.h>
#include <gui/ConsumerBase.h>

namespace android {

class GLConsumer : public ConsumerBase {
public:
    GLConsumer(const sp<IGraphicBufferConsumer>& bq, uint32_t tex, uint32_t textureTarget,
               bool useFenceSync, bool isControlledByApp);
    // Detached: attachToContext() gives it its texture.
    GLConsumer(const sp<IGraphicBufferConsumer>& bq, uint32_t textureTarget, bool useFenceSync,
               bool isControlledByApp);

    // Latches the oldest queued frame (none queued: the current one stays,
    // the texture is bound all the same). NO_INIT once abandoned,
    // INVALID_OPERATION when detached or another context is current.
    status_t updateTexImage();
    // Gives the current frame back; the texture keeps no frame.
    status_t releaseTexImage();

    uint64_t getFrameNumber();
    int64_t getTimestamp();
    uint32_t getCurrentTransform();
    int getCurrentScalingMode();
    sp<GraphicBuffer> getCurrentBuffer();
    uint32_t getCurrentTextureTarget() const { return mTexTarget; }

    status_t detachFromContext();
    status_t attachToContext(uint32_t tex);

protected:
    void abandonLocked() override;

private:
    struct EglSlot {
        sp<GraphicBuffer> buffer;
        EGLImageKHR image = EGL_NO_IMAGE_KHR;
        EGLDisplay display = EGL_NO_DISPLAY;
    };

    status_t checkContext_l(EGLDisplay display, EGLContext context);
    // Binds the current frame's image (made on first use) to the texture.
    status_t bindImage_l(EGLDisplay display);
    // Gives a frame back, behind a fence when a context is current.
    void release_l(const BufferItem& item, EGLDisplay display);
    void destroyImages_l();

    const uint32_t mTexTarget;
    const bool mUseFenceSync;
    uint32_t mTexName;
    bool mAttached;
    EGLDisplay mEglDisplay;
    EGLContext mEglContext;
    EglSlot mEglSlots[BufferQueue::NUM_BUFFER_SLOTS];
    BufferItem mCurrent;  // mSlot INVALID_BUFFER_SLOT when no frame is latched
};

}  // namespace android

#endif
