#include <gui/GLConsumer.h>

#include <GLES2/gl2.h>
#include <GLES2/gl2ext.h>

#include "core/egl/EglExtensions.h"
#include "core/egl/EglNativeSeam.h"
#include "vccore/vc_log.h"

namespace android {

GLConsumer::GLConsumer(const sp<IGraphicBufferConsumer>& bq, uint32_t tex, uint32_t textureTarget,
                       bool useFenceSync, bool isControlledByApp)
    : ConsumerBase(bq, isControlledByApp),
      mTexTarget(textureTarget),
      mUseFenceSync(useFenceSync),
      mTexName(tex),
      mAttached(true),
      mEglDisplay(EGL_NO_DISPLAY),
      mEglContext(EGL_NO_CONTEXT) {
    if (bq != nullptr) bq->setConsumerUsageBits(GraphicBuffer::USAGE_HW_TEXTURE);
}

GLConsumer::GLConsumer(const sp<IGraphicBufferConsumer>& bq, uint32_t textureTarget,
                       bool useFenceSync, bool isControlledByApp)
    : GLConsumer(bq, 0, textureTarget, useFenceSync, isControlledByApp) {
    mAttached = false;
}

status_t GLConsumer::checkContext_l(EGLDisplay display, EGLContext context) {
    if (display == EGL_NO_DISPLAY || context == EGL_NO_CONTEXT) {
        VF_LogMsg(VF_LOG_ERROR, "GLConsumer: no current EGL context");
        return INVALID_OPERATION;
    }
    if ((mEglDisplay != EGL_NO_DISPLAY && mEglDisplay != display) ||
        (mEglContext != EGL_NO_CONTEXT && mEglContext != context)) {
        VF_LogMsg(VF_LOG_ERROR, "GLConsumer: attached to another EGL context");
        return INVALID_OPERATION;
    }
    mEglDisplay = display;
    mEglContext = context;
    return NO_ERROR;
}

status_t GLConsumer::bindImage_l(EGLDisplay display) {
    glBindTexture(mTexTarget, mTexName);
    if (mCurrent.mSlot == BufferItem::INVALID_BUFFER_SLOT) return NO_ERROR;
    EglSlot& slot = mEglSlots[mCurrent.mSlot];
    if (slot.buffer != mCurrent.mGraphicBuffer || slot.display != display) {
        // A new buffer in the slot (or another display): a new image.
        if (slot.image != EGL_NO_IMAGE_KHR)
            EglNativeSeam::get().destroyImage(slot.display, slot.image);
        slot = EglSlot();
        slot.image =
            EglNativeSeam::get().createNativeBufferImage(display, mCurrent.mGraphicBuffer.get());
        if (slot.image == EGL_NO_IMAGE_KHR) {
            VF_LogMsg(VF_LOG_ERROR, "GLConsumer: no EGL image for frame %llu (0x%04x)",
                      (unsigned long long)mCurrent.mFrameNumber, eglGetError());
            return UNKNOWN_ERROR;
        }
        slot.buffer = mCurrent.mGraphicBuffer;
        slot.display = display;
    }
    // A frame drawn by another context may still be on its way (a device
    // waits for the acquire fence here).
    mCurrent.mGraphicBuffer->waitForGpuWrite();
    while (glGetError() != GL_NO_ERROR) {
    }
    EglExtensions::get().glEGLImageTargetTexture2DOES(mTexTarget, (GLeglImageOES)slot.image);
    GLenum error = glGetError();
    if (error != GL_NO_ERROR) {
        VF_LogMsg(VF_LOG_ERROR, "GLConsumer: binding the image of frame %llu failed (0x%04x)",
                  (unsigned long long)mCurrent.mFrameNumber, error);
        return UNKNOWN_ERROR;
    }
    return NO_ERROR;
}

void GLConsumer::release_l(const BufferItem& item, EGLDisplay display) {
    if (item.mSlot == BufferItem::INVALID_BUFFER_SLOT) return;
    EGLSyncKHR fence = EGL_NO_SYNC_KHR;
    if (display != EGL_NO_DISPLAY && eglGetCurrentContext() != EGL_NO_CONTEXT) {
        // The GPU may still sample the frame: the producer waits for this
        // fence before it writes the buffer again.
        if (mUseFenceSync && EglExtensions::hasEgl(display, "EGL_KHR_fence_sync")) {
            fence = EglExtensions::get().eglCreateSyncKHR(display, EGL_SYNC_FENCE_KHR, nullptr);
        }
        if (fence != EGL_NO_SYNC_KHR) {
            glFlush();
        } else {
            glFinish();
        }
    }
    mConsumer->releaseBuffer(item.mSlot, item.mFrameNumber, display, fence);
}

status_t GLConsumer::updateTexImage() {
    Mutex::Autolock lock(mMutex);
    if (mAbandoned) return NO_INIT;
    if (!mAttached) return INVALID_OPERATION;
    EGLDisplay display = eglGetCurrentDisplay();
    status_t status = checkContext_l(display, eglGetCurrentContext());
    if (status != NO_ERROR) return status;
    BufferItem item;
    status = mConsumer->acquireBuffer(&item, 0);
    if (status == IGraphicBufferConsumer::NO_BUFFER_AVAILABLE) {
        glBindTexture(mTexTarget, mTexName);
        return NO_ERROR;
    }
    if (status != NO_ERROR) return status;
    const BufferItem previous = mCurrent;
    mCurrent = item;
    status = bindImage_l(display);
    if (status != NO_ERROR) {
        // The new frame goes back; the texture keeps the one it had.
        mConsumer->releaseBuffer(item.mSlot, item.mFrameNumber, EGL_NO_DISPLAY, EGL_NO_SYNC_KHR);
        mCurrent = previous;
        bindImage_l(display);
        return status;
    }
    release_l(previous, display);
    return NO_ERROR;
}

status_t GLConsumer::releaseTexImage() {
    Mutex::Autolock lock(mMutex);
    if (mAbandoned) return NO_INIT;
    release_l(mCurrent, mEglDisplay);
    mCurrent = BufferItem();
    return NO_ERROR;
}

uint64_t GLConsumer::getFrameNumber() {
    Mutex::Autolock lock(mMutex);
    return mCurrent.mFrameNumber;
}

int64_t GLConsumer::getTimestamp() {
    Mutex::Autolock lock(mMutex);
    return mCurrent.mTimestamp;
}

uint32_t GLConsumer::getCurrentTransform() {
    Mutex::Autolock lock(mMutex);
    return mCurrent.mTransform;
}

int GLConsumer::getCurrentScalingMode() {
    Mutex::Autolock lock(mMutex);
    return mCurrent.mScalingMode;
}

sp<GraphicBuffer> GLConsumer::getCurrentBuffer() {
    Mutex::Autolock lock(mMutex);
    return mCurrent.mGraphicBuffer;
}

status_t GLConsumer::detachFromContext() {
    Mutex::Autolock lock(mMutex);
    if (mAbandoned) return NO_INIT;
    if (!mAttached) return INVALID_OPERATION;
    EGLDisplay display = eglGetCurrentDisplay();
    EGLContext context = eglGetCurrentContext();
    if ((mEglDisplay != EGL_NO_DISPLAY && mEglDisplay != display) ||
        (mEglContext != EGL_NO_CONTEXT && mEglContext != context)) {
        VF_LogMsg(VF_LOG_ERROR, "GLConsumer: detach from a context that is not current");
        return INVALID_OPERATION;
    }
    if (display != EGL_NO_DISPLAY && context != EGL_NO_CONTEXT && mTexName != 0) {
        glDeleteTextures(1, &mTexName);
    }
    destroyImages_l();
    mTexName = 0;
    mEglDisplay = EGL_NO_DISPLAY;
    mEglContext = EGL_NO_CONTEXT;
    mAttached = false;
    return NO_ERROR;
}

status_t GLConsumer::attachToContext(uint32_t tex) {
    Mutex::Autolock lock(mMutex);
    if (mAbandoned) return NO_INIT;
    if (mAttached) return INVALID_OPERATION;
    EGLDisplay display = eglGetCurrentDisplay();
    status_t status = checkContext_l(display, eglGetCurrentContext());
    if (status != NO_ERROR) return status;
    mTexName = tex;
    mAttached = true;
    // The frame latched before the detach shows in the new texture.
    return bindImage_l(display);
}

void GLConsumer::destroyImages_l() {
    for (EglSlot& slot : mEglSlots) {
        if (slot.image != EGL_NO_IMAGE_KHR)
            EglNativeSeam::get().destroyImage(slot.display, slot.image);
        slot = EglSlot();
    }
}

void GLConsumer::abandonLocked() {
    // No context needed: images are the display's, and the queue takes the
    // frame back without a fence once abandoned.
    destroyImages_l();
    if (mCurrent.mSlot != BufferItem::INVALID_BUFFER_SLOT) {
        mConsumer->releaseBuffer(mCurrent.mSlot, mCurrent.mFrameNumber, EGL_NO_DISPLAY,
                                 EGL_NO_SYNC_KHR);
    }
    mCurrent = BufferItem();
    ConsumerBase::abandonLocked();
}

}  // namespace android
