// Recording into the video encoder's input surface. Not built yet: the
// settings are kept so that a client can already make its calls, but no
// frame is recorded; setRecordingSurface() refuses a producer with
// VC_ERROR_NOT_IMPLEMENTED, so a client learns it at once.
#include "core/egl/EglCheck.h"
#include "kivimaging/OpenGLManager.h"
#include "vccore/vc_error.h"
#include "vccore/vc_log.h"

#define VC_SOURCE "core/egl/OpenGLManager"

int OpenGLManager::setRecordingSurface(
    const android::sp<android::IGraphicBufferProducer>& producer) {
    EglLog(VF_LOG_DEBUG, "EGL: Called setRecordingSurface: %p", (void*)producer.get());
    if (producer == nullptr) return 0;
    return VC_REPORT(VC_ERROR_NOT_IMPLEMENTED);
}

void OpenGLManager::setRecordingInterval(int ms) {
    EglLog(VF_LOG_DEBUG, "EGL: setRecordingInterval: %d", ms);
    mRecordingInterval = ms;
}

void OpenGLManager::setRecordingMotion(int motion) {
    EglLog(VF_LOG_DEBUG, "EGL: setRecordingMotion: %d", motion);
    if (motion != 0) {
        mRecordingInterval = 0;
        ++mRecordingMotion;
    } else {
        mRecordingMotion = 0;
    }
}

// Render thread, every frame after the picture step: nothing to record yet.
int OpenGLManager::onDrawFrame_Recording() {
    return 0;
}

int OpenGLManager::initializeRecording() {
    return VC_REPORT(VC_ERROR_NOT_IMPLEMENTED);
}
