// The NDK's view of a window (ANativeWindow_* functions) on a host.
#ifndef KIV_HOST_ANDROID_NATIVE_WINDOW_H
#define KIV_HOST_ANDROID_NATIVE_WINDOW_H

#include <stdint.h>

#include <system/window.h>

#ifdef __cplusplus
extern "C" {
#endif

enum {
    WINDOW_FORMAT_RGBA_8888 = 1,
    WINDOW_FORMAT_RGBX_8888 = 2,
    WINDOW_FORMAT_RGB_565 = 4,
};

void ANativeWindow_acquire(ANativeWindow* window);
void ANativeWindow_release(ANativeWindow* window);

// Width, height and format of the buffers the window will hand out next;
// a negative status on failure.
int32_t ANativeWindow_getWidth(ANativeWindow* window);
int32_t ANativeWindow_getHeight(ANativeWindow* window);
int32_t ANativeWindow_getFormat(ANativeWindow* window);

// 0 width and height go back to the window's default size; 0 format keeps
// the window's default format.
int32_t ANativeWindow_setBuffersGeometry(ANativeWindow* window, int32_t width, int32_t height,
                                         int32_t format);

#ifdef __cplusplus
}
#endif

#endif
