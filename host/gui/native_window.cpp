#include <android/native_window.h>

void ANativeWindow_acquire(ANativeWindow* window) {
    if (window != nullptr) window->common.incRef(&window->common);
}

void ANativeWindow_release(ANativeWindow* window) {
    if (window != nullptr) window->common.decRef(&window->common);
}

static int32_t queryWindow(ANativeWindow* window, int what) {
    if (window == nullptr) return -22;  // -EINVAL
    int value = 0;
    int result = window->query(window, what, &value);
    return result < 0 ? result : value;
}

int32_t ANativeWindow_getWidth(ANativeWindow* window) {
    return queryWindow(window, NATIVE_WINDOW_WIDTH);
}

int32_t ANativeWindow_getHeight(ANativeWindow* window) {
    return queryWindow(window, NATIVE_WINDOW_HEIGHT);
}

int32_t ANativeWindow_getFormat(ANativeWindow* window) {
    return queryWindow(window, NATIVE_WINDOW_FORMAT);
}

int32_t ANativeWindow_setBuffersGeometry(ANativeWindow* window, int32_t width, int32_t height,
                                         int32_t format) {
    if (window == nullptr) return -22;
    int result = native_window_set_buffers_dimensions(window, width, height);
    if (result != 0) return result;
    return native_window_set_buffers_format(window, format);
}
