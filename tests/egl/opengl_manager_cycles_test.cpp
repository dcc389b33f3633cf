// The render manager started, used and released over and over: a picture
// (or snapshot, or screenshot) each time, one and two cameras, both modes.
// Nothing may accumulate: threads, open files (host buffers are memory
// files), GL objects of any context, or memory (LeakSanitizer under ASan).
// kiv-test-labels: threads
#include <dirent.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include "support/camera_frames.h"
#include "support/frame_collector.h"
#include "support/gl_fault.h"
#include "support/live_preview.h"
#include "support/manual_clock.h"
#include "support/open_files.h"

namespace {

int threads() {
    DIR* dir = opendir("/proc/self/task");
    int n = 0;
    while (dir != nullptr && readdir(dir) != nullptr) ++n;
    if (dir != nullptr) closedir(dir);
    return n;
}

// Detached workers can still be leaving the kernel's task list when the
// queue that owned them says they are done; a leaked thread never leaves, so
// a bounded wait for the count keeps the check and loses the race.
int settledThreads(int expected) {
    for (int i = 0; i < 500 && threads() > expected; ++i) usleep(10000);
    return threads();
}

#if defined(__SANITIZE_THREAD__)
// Under ThreadSanitizer a cycle takes about half a second.
const int kCycles = 40;
#else
const int kCycles = 100;
#endif

void cycle(int i) {
    ManualClock clock;
    LivePreviewSetup setup;
    setup.layout = i % 3 == 2 ? CAMERA_LAYOUT_DUAL : CAMERA_LAYOUT_SINGLE;
    setup.mode = i % 2 == 1 ? OPENGL_MANAGER_INTERMEDIATE : OPENGL_MANAGER_DIRECT;
    FrameCollector got(i % 4 == 3 ? VC_FORMAT_NV21 : VC_FORMAT_RGBA);
    LivePreviewEffect sepia(401);
    LivePreview live(setup);
    live.manager->setFilter(&sepia.imaging);
    live.manager->setOnPictureListener(&got);
    ASSERT_TRUE(live.startPaced(clock));
    const CaptureMode mode = (CaptureMode)(1 + i % 3);
    if (mode == CAPTURE_PICTURE) {
        const std::vector<uint8_t> nv21 = CameraFrames_nv21(i, 32, 24);
        VCImage* base = VCImage_createNew(32, 24, VC_FORMAT_NV21);
        std::copy(nv21.begin(), nv21.end(), base->data);
        VCImage* pip = setup.layout == CAMERA_LAYOUT_DUAL ? VCImage_clone(base) : nullptr;
        ASSERT_EQ(live.manager->applyToPicture(base, pip), 0);
    }
    live.manager->onTakePicture(mode);
    ASSERT_TRUE(live.step(clock));
    ASSERT_TRUE(got.waitFor(1));
    ASSERT_EQ(got.frames().size(), 1u) << "cycle " << i;
    live.release();
}

TEST(ManagerCycles, NothingAccumulates) {
    // The first cycle sets up what lives for the whole process (the host's
    // own context and buffer pools, converter threads' first use).
    ASSERT_NO_FATAL_FAILURE(cycle(0));
    const int threadsBefore = threads();
    const int filesBefore = Test_openFiles();
    const long objectsBefore = GlFault_objectBalance();
    for (int i = 1; i <= kCycles; ++i) ASSERT_NO_FATAL_FAILURE(cycle(i));
    EXPECT_EQ(settledThreads(threadsBefore), threadsBefore);
    EXPECT_EQ(Test_openFiles(), filesBefore);
    EXPECT_EQ(GlFault_objectBalance(), objectsBefore);
}

}  // namespace
