// ANativeWindow: the producer end of a window's buffer queue, laid out as on
// a device (a C struct of function pointers with a reference-counted base).
// The host graphics layer implements it (android::Surface over a
// BufferQueue) and its EGL seam renders into it.
#ifndef KIV_HOST_SYSTEM_WINDOW_H
#define KIV_HOST_SYSTEM_WINDOW_H

#include <stdarg.h>
#include <stdint.h>
#include <string.h>

#include <nativebase/nativebase.h>
#include <system/graphics.h>

#ifdef __cplusplus
extern "C" {
#endif

// Attributes for ANativeWindow::query().
enum {
    NATIVE_WINDOW_WIDTH = 0,
    NATIVE_WINDOW_HEIGHT = 1,
    NATIVE_WINDOW_FORMAT = 2,
    NATIVE_WINDOW_MIN_UNDEQUEUED_BUFFERS = 3,
    NATIVE_WINDOW_QUEUES_TO_WINDOW_COMPOSER = 4,
    NATIVE_WINDOW_CONCRETE_TYPE = 5,
    NATIVE_WINDOW_DEFAULT_WIDTH = 6,
    NATIVE_WINDOW_DEFAULT_HEIGHT = 7,
    NATIVE_WINDOW_TRANSFORM_HINT = 8,
    NATIVE_WINDOW_CONSUMER_RUNNING_BEHIND = 9,
    NATIVE_WINDOW_CONSUMER_USAGE_BITS = 10,
};

// Operations for ANativeWindow::perform().
enum {
    NATIVE_WINDOW_SET_USAGE = 0,
    NATIVE_WINDOW_CONNECT = 1,
    NATIVE_WINDOW_DISCONNECT = 2,
    NATIVE_WINDOW_SET_CROP = 3,
    NATIVE_WINDOW_SET_BUFFER_COUNT = 4,
    NATIVE_WINDOW_SET_BUFFERS_GEOMETRY = 5,
    NATIVE_WINDOW_SET_BUFFERS_TRANSFORM = 6,
    NATIVE_WINDOW_SET_BUFFERS_TIMESTAMP = 7,
    NATIVE_WINDOW_SET_BUFFERS_DIMENSIONS = 8,
    NATIVE_WINDOW_SET_BUFFERS_FORMAT = 9,
    NATIVE_WINDOW_SET_SCALING_MODE = 10,
    NATIVE_WINDOW_LOCK = 11,
    NATIVE_WINDOW_UNLOCK_AND_POST = 12,
    NATIVE_WINDOW_API_CONNECT = 13,
    NATIVE_WINDOW_API_DISCONNECT = 14,
    NATIVE_WINDOW_SET_BUFFERS_USER_DIMENSIONS = 15,
    NATIVE_WINDOW_SET_POST_TRANSFORM_CROP = 16,
    NATIVE_WINDOW_SET_BUFFERS_STICKY_TRANSFORM = 17,
    // How long a dequeue may block, in ns (int64_t): < 0 for ever, 0 not at all.
    NATIVE_WINDOW_SET_DEQUEUE_TIMEOUT = 42,
};

// Buffer transforms (NATIVE_WINDOW_SET_BUFFERS_TRANSFORM and the sticky one).
enum {
    NATIVE_WINDOW_TRANSFORM_FLIP_H = 0x01,
    NATIVE_WINDOW_TRANSFORM_FLIP_V = 0x02,
    NATIVE_WINDOW_TRANSFORM_ROT_90 = 0x04,
    NATIVE_WINDOW_TRANSFORM_ROT_180 = 0x03,
    NATIVE_WINDOW_TRANSFORM_ROT_270 = 0x07,
};

// NATIVE_WINDOW_SET_SCALING_MODE values.
enum {
    NATIVE_WINDOW_SCALING_MODE_FREEZE = 0,
    NATIVE_WINDOW_SCALING_MODE_SCALE_TO_WINDOW = 1,
    NATIVE_WINDOW_SCALING_MODE_SCALE_CROP = 2,
};

// The timestamp that asks the window to stamp the buffer when it is queued.
#define NATIVE_WINDOW_TIMESTAMP_AUTO ((int64_t)INT64_MIN)

// Producer APIs for NATIVE_WINDOW_API_CONNECT.
enum {
    NATIVE_WINDOW_API_EGL = 1,
    NATIVE_WINDOW_API_CPU = 2,
    NATIVE_WINDOW_API_MEDIA = 3,
    NATIVE_WINDOW_API_CAMERA = 4,
};

// Values of NATIVE_WINDOW_CONCRETE_TYPE.
enum {
    NATIVE_WINDOW_FRAMEBUFFER = 0,
    NATIVE_WINDOW_SURFACE = 1,
};

typedef struct ANativeWindow {
#ifdef __cplusplus
    ANativeWindow() : flags(0), minSwapInterval(0), maxSwapInterval(0), xdpi(0), ydpi(0) {
        common.magic = ANDROID_NATIVE_WINDOW_MAGIC;
        common.version = sizeof(ANativeWindow);
        memset(common.reserved, 0, sizeof(common.reserved));
        memset(oem, 0, sizeof(oem));
    }

    // What sp<ANativeWindow> expects.
    void incStrong(const void* /*id*/) const {
        common.incRef(const_cast<android_native_base_t*>(&common));
    }
    void decStrong(const void* /*id*/) const {
        common.decRef(const_cast<android_native_base_t*>(&common));
    }
#endif

    struct android_native_base_t common;

    const uint32_t flags;
    const int minSwapInterval;
    const int maxSwapInterval;
    const float xdpi;
    const float ydpi;
    intptr_t oem[4];

    int (*setSwapInterval)(struct ANativeWindow* window, int interval);
    int (*dequeueBuffer_DEPRECATED)(struct ANativeWindow* window,
                                    struct ANativeWindowBuffer** buffer);
    int (*lockBuffer_DEPRECATED)(struct ANativeWindow* window, struct ANativeWindowBuffer* buffer);
    int (*queueBuffer_DEPRECATED)(struct ANativeWindow* window, struct ANativeWindowBuffer* buffer);
    int (*query)(const struct ANativeWindow* window, int what, int* value);
    int (*perform)(struct ANativeWindow* window, int operation, ...);
    int (*cancelBuffer_DEPRECATED)(struct ANativeWindow* window,
                                   struct ANativeWindowBuffer* buffer);
    // fenceFd: -1 on the host, where buffers are ready when handed over.
    int (*dequeueBuffer)(struct ANativeWindow* window, struct ANativeWindowBuffer** buffer,
                         int* fenceFd);
    int (*queueBuffer)(struct ANativeWindow* window, struct ANativeWindowBuffer* buffer,
                       int fenceFd);
    int (*cancelBuffer)(struct ANativeWindow* window, struct ANativeWindowBuffer* buffer,
                        int fenceFd);
} ANativeWindow;

typedef struct ANativeWindow android_native_window_t;

// The variadic arguments of perform() are plain ints (usage bits included),
// as callers pass literals: NATIVE_WINDOW_SET_USAGE and
// NATIVE_WINDOW_SET_BUFFER_COUNT read one int.
static inline int native_window_set_usage(struct ANativeWindow* window, uint32_t usage) {
    return window->perform(window, NATIVE_WINDOW_SET_USAGE, (int)usage);
}

static inline int native_window_set_buffer_count(struct ANativeWindow* window, int bufferCount) {
    return window->perform(window, NATIVE_WINDOW_SET_BUFFER_COUNT, bufferCount);
}

static inline int native_window_set_buffers_dimensions(struct ANativeWindow* window, int w, int h) {
    return window->perform(window, NATIVE_WINDOW_SET_BUFFERS_DIMENSIONS, w, h);
}

static inline int native_window_set_buffers_format(struct ANativeWindow* window, int format) {
    return window->perform(window, NATIVE_WINDOW_SET_BUFFERS_FORMAT, format);
}

static inline int native_window_set_buffers_timestamp(struct ANativeWindow* window,
                                                      int64_t timestamp) {
    return window->perform(window, NATIVE_WINDOW_SET_BUFFERS_TIMESTAMP, timestamp);
}

static inline int native_window_set_buffers_geometry(struct ANativeWindow* window, int w, int h,
                                                     int format) {
    return window->perform(window, NATIVE_WINDOW_SET_BUFFERS_GEOMETRY, w, h, format);
}

static inline int native_window_set_buffers_transform(struct ANativeWindow* window, int transform) {
    return window->perform(window, NATIVE_WINDOW_SET_BUFFERS_TRANSFORM, transform);
}

static inline int native_window_set_buffers_sticky_transform(struct ANativeWindow* window,
                                                             int transform) {
    return window->perform(window, NATIVE_WINDOW_SET_BUFFERS_STICKY_TRANSFORM, transform);
}

static inline int native_window_api_connect(struct ANativeWindow* window, int api) {
    return window->perform(window, NATIVE_WINDOW_API_CONNECT, api);
}

static inline int native_window_api_disconnect(struct ANativeWindow* window, int api) {
    return window->perform(window, NATIVE_WINDOW_API_DISCONNECT, api);
}

#ifdef __cplusplus
}
#endif

#endif
