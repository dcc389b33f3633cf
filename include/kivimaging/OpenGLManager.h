// The live render manager for a camera client: one EGL context on a render
// thread of its own that latches the frames of one or two cameras, draws the
// current effect over them into the client's preview window at about 24
// frames a second, and on the same thread serves still pictures, snapshots
// and screenshots (and, later in the same frame, recording).
//
// Typical use, from the client's threads:
//   sp<OpenGLManager> m = new OpenGLManager(OPENGL_MANAGER_DIRECT, DISPLAY_DEVICE_GPU);
//   m->setCameraSize(w, h, 0, 0);
//   m->setPreviewWindow(window, CAMERA_LAYOUT_SINGLE);
//   m->setFilter(&imaging);
//   m->startRenderThread();
//   camera.connect(m->getNewPreviewWindowForOpenGL(0));  // blocks until the window exists
//   m->notifyGLSurfaceConnectionComplete();              // the thread starts drawing
//   ...
//   m->release();  // bounded wait for the thread, which frees every GL object itself
//
// All GL work happens on the render thread; the setters only store values
// that the next frame reads.
//
// A client also includes <kivimaging/KivImaging.h> for the effect it hands
// to setFilter(), and the platform's <system/window.h> for the windows.
#ifndef KIVIMAGING_OPENGLMANAGER_H
#define KIVIMAGING_OPENGLMANAGER_H

#include <stdint.h>

#include <atomic>

#include <utils/Mutex.h>
#include <utils/RefBase.h>
#include <utils/StrongPointer.h>

#include "kivimaging/OnFrameListener.h"

// Only named here: the platform's window, the library's internals and the
// effect handle of KivImaging.h.
struct ANativeWindow;
class ANWCondition;
class AsyncImageConverter;
class EglEnvironment;
class EglImage;
class EglProgram;
class EglSnapShot;
class EglSnapShotLite;
class EglWindow;
class EglWindowSurface;
class KivFilter;
class KivImaging;
namespace android {
class IGraphicBufferProducer;
}

// How the effect reaches the screen (and the recorder).
enum OpenGLManagerMode : int {
    // The effect is drawn straight into the preview surface.
    OPENGL_MANAGER_DIRECT = 0,
    // The effect is drawn once into an off-screen image, which is then copied
    // to the screen and to the recorder (one effect pass for both).
    OPENGL_MANAGER_INTERMEDIATE = 2,
};

// Who reads the preview window's buffers.
enum DisplayDeviceMode : int {
    // The display's GPU composition.
    DISPLAY_DEVICE_GPU = 0,
    // Software: the preview buffers are also readable by the CPU.
    DISPLAY_DEVICE_SOFTWARE = 1,
};

// Camera layouts, the second argument of setPreviewWindow().
enum {
    CAMERA_LAYOUT_SINGLE = 10,
    // One camera shown mirrored left to right (as a front camera).
    CAMERA_LAYOUT_SINGLE_MIRRORED = 11,
    // Two cameras (picture-in-picture effects).
    CAMERA_LAYOUT_DUAL = 20,
};

// The still output asked of the next frame.
enum CaptureMode : int {
    CAPTURE_NONE = 0,
    // The picture handed over with applyToPicture(), through the effect.
    CAPTURE_PICTURE = 1,
    // The rendered effect at preview size.
    CAPTURE_SNAPSHOT = 2,
    // As a snapshot, with the screen's orientation.
    CAPTURE_SCREENSHOT = 3,
};

// setDualShotAsyncCapture() values, for two-camera effects.
enum {
    DUAL_SHOT_NONE = 0,
    // On the next frame: latch both cameras, then drop the held pictures.
    DUAL_SHOT_APPLY = 3,
    // The held second picture stands in for camera 1.
    DUAL_SHOT_STILL_CAMERA1 = 4,
    // The held base picture stands in for camera 0.
    DUAL_SHOT_STILL_CAMERA0 = 5,
};

class OpenGLManager : public virtual android::RefBase {
public:
    class RenderThread;

    OpenGLManager(OpenGLManagerMode mode, DisplayDeviceMode display);
    // Calls release().
    virtual ~OpenGLManager();

    // Client threads. ---------------------------------------------------
    // Starts the render thread (once; a second call is logged and ignored).
    void startRenderThread();
    // The window camera `id` (0 or 1) fills; blocks until the render thread
    // has made it. Null for another id, or when the thread could not start.
    android::sp<ANativeWindow> getNewPreviewWindowForOpenGL(int id);
    // The camera is connected: the render thread starts drawing.
    void notifyGLSurfaceConnectionComplete();
    // Stops the render thread (bounded wait of 2.75 s) and frees everything.
    void release();

    void setCameraSize(int width0, int height0, int width1, int height1);
    void setPreviewSize(int width, int height);
    void setPreviewWindow(const android::sp<ANativeWindow>& window, int layout);
    // The effect of `imaging` (not owned) is drawn from the next frame on;
    // null draws the camera as it is.
    void setFilter(const KivImaging* imaging);
    void setSaveAsFlipped(bool flipped);
    void setOnPictureListener(OnFrameListener* listener);
    void setDualShotAsyncCapture(int mode);
    void onTakePicture(CaptureMode mode);
    // Takes ownership of both pictures (either may be null) and frees the
    // ones held before; the next CAPTURE_PICTURE draws the effect over them.
    // 0, or VC_ERROR_INVALID_STATE without a running render thread or a
    // picture listener (the caller then keeps the pictures).
    int applyToPicture(VCImage* base, VCImage* pip);
    // Recording: the encoder's input; null stops recording.
    int setRecordingSurface(const android::sp<android::IGraphicBufferProducer>& producer);
    void setRecordingInterval(int ms);
    void setRecordingMotion(int motion);
    // Draw the next frame soon (at most 16 ms after this one began) instead
    // of waiting out the frame period; ignored during the first ten frames
    // and while recording.
    void requestRender();
    // Frames are still latched and drawn but no longer shown.
    void stopPreview();
    // The cameras' queued frames are skipped over the next renders.
    void flushCameraSource();

    OpenGLManager(const OpenGLManager&) = delete;
    OpenGLManager& operator=(const OpenGLManager&) = delete;

private:
    // Render thread only. -----------------------------------------------
    int initializeEGLEnv();
    int setCameraSource(int id);
    int initializeGL();
    int updateCameraSource(int id, bool first);
    void setupPreviewGeometry(bool recording);
    int onDrawFrame();
    int onDrawFrameMirroring(bool recording);
    int onDrawFrame_TakePicture();
    int onDrawFrame_Recording();
    int initializeRecording();
    bool initializeRecordingFBO();
    int initializeStillImageDualAsync();
    int setupPictureEnv(VCImage* base, VCImage* pip);
    void setupPictureGeometry(int width0, int height0, int width1, int height1);
    int takePicture(OnFrameListener& listener);
    int takeSnapshot(OnFrameListener& listener, bool screenshot);
    // A copy of camera `id`'s current frame, for a picture without data.
    VCImage* previewPicture(int id);
    void releaseFromGL();
    void releaseCommon();
    void previewRequestRender();
    bool isRecording();
    // The thread exists and has not been asked to stop.
    bool isRenderThreadRunning();

    android::Mutex mLock;
    const int mMode;
    const int mDisplayDeviceMode;
    std::atomic<int> mCameraLayout;
    android::sp<ANativeWindow> mPreviewWindow;
    android::sp<EglEnvironment> mEglEnv;
    android::sp<EglWindowSurface> mPreviewSurface;
    android::sp<EglWindowSurface> mRecordingSurface;
    std::atomic<bool> mRecording;
    std::atomic<bool> mPreviewStopped;
    android::sp<EglSnapShot> mSnapShot;
    android::sp<EglSnapShotLite> mSnapShotLite;
    android::sp<EglSnapShotLite> mScreenShotLite;
    std::atomic<OnFrameListener*> mPictureListener;
    VCImage* mBasePicture;
    VCImage* mPipPicture;
    std::atomic<int> mCaptureRequest;
    std::atomic<bool> mSaveAsFlipped;
    android::sp<AsyncImageConverter> mConverter;
    android::sp<EglProgram> mProgram;
    android::sp<EglProgram> mCopyProgram;
    android::sp<EglImage> mIntermediateImage;
    int mCameraWidth0, mCameraHeight0, mCameraWidth1, mCameraHeight1;
    int mPreviewWidth, mPreviewHeight;
    int mRecordingWidth, mRecordingHeight;
    std::atomic<int> mDualShotMode;
    std::atomic<int> mRecordingInterval;
    std::atomic<int> mRecordingMotion;
    android::sp<ANWCondition> mWindowReady;
    android::sp<EglWindow> mRecordingWindow;
    android::sp<EglWindow> mEglCameraSource0;
    android::sp<EglWindow> mEglCameraSource1;
    android::sp<EglImage> mStillImage;
    std::atomic<KivFilter*> mFilter;
    android::sp<RenderThread> mRenderThread;
    // Guards the pictures and the thread reference between the client's
    // threads and the render thread (never held across GL work).
    android::Mutex mStateLock;
    // Held while a capture draws the pictures, so that applyToPicture()
    // cannot free them meanwhile.
    android::Mutex mPictureLock;
};

#endif
