// Display references, as Android's EGL keeps them (see the .cpp).
#ifndef KIV_HOST_GRAPHICS_EGLDISPLAYREFERENCES_H
#define KIV_HOST_GRAPHICS_EGLDISPLAYREFERENCES_H

#include <EGL/egl.h>

namespace android {

// Successful eglInitialize calls on `display` not yet matched by an
// eglTerminate (0 for a display nobody initialised).
int EglDisplayReferences_count(EGLDisplay display);

}  // namespace android

#endif
