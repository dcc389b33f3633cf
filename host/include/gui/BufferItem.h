// One queued frame as the consumer sees it: the buffer, where it sits in the
// queue's slots, and what the producer said about it.
#ifndef KIV_HOST_GUI_BUFFERITEM_H
#define KIV_HOST_GUI_BUFFERITEM_H

#include <stdint.h>

#include <system/window.h>
#include <ui/GraphicBuffer.h>
#include <utils/StrongPointer.h>

namespace android {

struct BufferItem {
    enum { INVALID_BUFFER_SLOT = -1 };

    sp<GraphicBuffer> mGraphicBuffer;
    int mSlot = INVALID_BUFFER_SLOT;
    uint64_t mFrameNumber = 0;  // 1 for the first frame ever queued
    int64_t mTimestamp = 0;     // ns
    bool mIsAutoTimestamp = false;
    uint32_t mTransform = 0;  // NATIVE_WINDOW_TRANSFORM_* bits
    int mScalingMode = NATIVE_WINDOW_SCALING_MODE_FREEZE;
};

}  // namespace android

#endif
