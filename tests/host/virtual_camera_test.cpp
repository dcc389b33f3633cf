// The host's virtual camera: every source (generator, pictures, a video file
// this test encodes with FFmpeg) reaches a window frame by frame with its
// number and boot-clock timestamp, and the camera's thread obeys stall,
// burst and stop.
// kiv-test-labels: threads
#include "kivhost/VirtualCamera.h"

#include <gtest/gtest.h>
#include <gui/HostWindow.h>
#include <gui/Surface.h>

#include <chrono>
#include <thread>

#include "support/camera_frames.h"
#include "support/eventually.h"
#include "support/log_capture.h"
#include "support/manual_clock.h"
#include "support/temp_dir.h"
#include "support/image_ptr.h"
#include "support/video_files.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_file.h"
#include "vccore/vc_log.h"

using namespace android;
using kivhost::VirtualCamera;

namespace {

// The next frame the window got, as NV21 bytes (empty when none).
std::vector<uint8_t> takeFrame(const sp<HostWindow>& window, int64_t* timestamp = nullptr) {
    sp<GraphicBuffer> buffer;
    if (window->acquireFrame(&buffer, nullptr, timestamp) != NO_ERROR) return {};
    void* pixels = nullptr;
    std::vector<uint8_t> bytes;
    if (buffer->lock(GraphicBuffer::USAGE_SW_READ_OFTEN, &pixels) == NO_ERROR) {
        const uint8_t* p = static_cast<uint8_t*>(pixels);
        bytes.assign(
            p, p + VCImage_requiredSize(buffer->getWidth(), buffer->getHeight(), VC_FORMAT_NV21));
        buffer->unlock();
    }
    window->releaseFrame(buffer);
    return bytes;
}

TEST(VirtualCameraTest, GeneratedFramesCarryTheirNumberAndTheBootClock) {
    ManualClock clock;
    const uint64_t indices[] = {0, 1, 7, 1023, 999999};
    for (uint64_t index : indices) {
        std::vector<uint8_t> rgba = CameraFrames_rgba(index, 64, 48);
        EXPECT_EQ(kivhost::VirtualCamera_decodeFrameNumber(rgba.data(), 64, 48, false),
                  (int64_t)index);
        // Bottom-up rows (as GL reads them) decode with the flag only.
        std::vector<uint8_t> flipped(rgba.size());
        for (int y = 0; y < 48; ++y) std::copy_n(&rgba[y * 256], 256, &flipped[(47 - y) * 256]);
        EXPECT_EQ(kivhost::VirtualCamera_decodeFrameNumber(flipped.data(), 64, 48, true),
                  (int64_t)index);
        EXPECT_NE(kivhost::VirtualCamera_decodeFrameNumber(flipped.data(), 64, 48, false),
                  (int64_t)index);
    }
    EXPECT_NE(CameraFrames_nv21(1, 64, 48), CameraFrames_nv21(2, 64, 48));  // the bars move
    EXPECT_EQ(kivhost::VirtualCamera_generator(63, 48), nullptr);

    sp<HostWindow> window = new HostWindow(16, 16);
    VirtualCamera camera(kivhost::VirtualCamera_generator(64, 48), 64, 48);
    ASSERT_EQ(camera.connect(window), 0);
    EXPECT_EQ(camera.connect(window), INVALID_OPERATION);
    EXPECT_EQ(window->getConnectedApi(), NATIVE_WINDOW_API_CAMERA);
    for (uint64_t i = 0; i < 3; ++i) {
        clock.advanceMs(33);
        ASSERT_EQ(camera.queueFrame(), 0);
        int64_t timestamp = 0;
        EXPECT_EQ(takeFrame(window, &timestamp), CameraFrames_nv21(i, 64, 48));
        EXPECT_EQ(timestamp, clock.bootTime());
    }
    camera.disconnect();
    EXPECT_EQ(window->getConnectedApi(), 0);
    EXPECT_EQ(camera.queueFrame(), NO_INIT);
    EXPECT_EQ(camera.framesQueued(), 3u);
    EXPECT_EQ(camera.framesNotQueued(), 1u);
}

TEST(VirtualCameraTest, AVideoFilePlaysThroughFrameByFrameThenEndsOrLoops) {
    kivtest::TempDir dir;
    const std::string path = dir.file("clip.mkv");
    ASSERT_TRUE(VideoFiles_writeGenerated(path, 96, 64, 10));
    for (bool loop : {false, true}) {
        sp<HostWindow> window = new HostWindow(96, 64);
        VirtualCamera camera(kivhost::VirtualCamera_video(path, 96, 64, loop), 96, 64);
        ASSERT_EQ(camera.connect(window), 0);
        for (int i = 0; i < 10; ++i) {
            ASSERT_EQ(camera.queueFrame(), 0) << i;
            ASSERT_EQ(takeFrame(window), CameraFrames_nv21(i, 96, 64)) << "frame " << i;
        }
        if (loop) {
            ASSERT_EQ(camera.queueFrame(), 0);
            EXPECT_EQ(takeFrame(window), CameraFrames_nv21(0, 96, 64));
        } else {
            EXPECT_EQ(camera.queueFrame(), NOT_ENOUGH_DATA);
            EXPECT_TRUE(camera.ended());
        }
    }
    LogCapture log;
    EXPECT_EQ(kivhost::VirtualCamera_video(dir.file("none.mkv"), 96, 64, true), nullptr);
    EXPECT_EQ(log.texts(), std::vector<std::string>{"VirtualCamera: cannot open the video " +
                                                    dir.file("none.mkv")});
}

TEST(VirtualCameraTest, PicturesOfAFolderComeInTurnStretchedToTheCamera) {
    kivtest::TempDir dir;
    const uint8_t colours[2][4] = {{200, 40, 30, 255}, {20, 90, 220, 255}};
    for (int i = 0; i < 2; ++i) {
        VCImage* picture = VCImage_createNew(8, 4, VC_FORMAT_RGBA);
        for (int p = 0; p < 32; ++p) std::copy_n(colours[i], 4, picture->data + p * 4);
        ASSERT_EQ(VCImage_saveToFile(picture, dir.file(i == 0 ? "a.png" : "b.PNG").c_str(), 90), 0);
        VCImage_destroy(picture);
    }
    kivtest::writeFile(dir.file("notes.txt"), {'x'});
    sp<HostWindow> window = new HostWindow(32, 16);
    VirtualCamera camera(kivhost::VirtualCamera_folder(dir.path(), 32, 16), 32, 16);
    ASSERT_EQ(camera.connect(window), 0);
    for (int i = 0; i < 3; ++i) {
        ASSERT_EQ(camera.queueFrame(), 0);
        std::vector<uint8_t> nv21 = takeFrame(window);
        ASSERT_EQ(nv21.size(), 32u * 16 * 3 / 2);
        // Uniform: every luma and chroma sample is the colour's, converted once.
        uint8_t rgbaPixels[2 * 2 * 4], yuvPixels[6];
        for (int p = 0; p < 4; ++p) std::copy_n(colours[i % 2], 4, rgbaPixels + p * 4);
        ImagePtr rgba(VCImage_createWrap(rgbaPixels, 2, 2, VC_FORMAT_RGBA, 0, 0));
        ImagePtr yuv(VCImage_createWrap(yuvPixels, 2, 2, VC_FORMAT_NV21, 0, 0));
        ASSERT_EQ(VCImage_convert(rgba.get(), yuv.get()), 0);
        for (size_t b = 0; b < 32 * 16; ++b) ASSERT_EQ(nv21[b], yuvPixels[0]) << "picture " << i;
        for (size_t b = 32 * 16; b < nv21.size(); ++b) ASSERT_EQ(nv21[b], yuvPixels[4 + b % 2]);
    }
    LogCapture log;
    kivtest::TempDir empty;
    EXPECT_EQ(kivhost::VirtualCamera_folder(empty.path(), 32, 16), nullptr);
    EXPECT_EQ(kivhost::VirtualCamera_pictures({dir.file("notes.txt")}, 32, 16), nullptr);
    EXPECT_TRUE(log.contains(VF_LOG_ERROR, "VirtualCamera: no pictures in " + empty.path()));
    EXPECT_TRUE(log.contains(VF_LOG_ERROR,
                             "VirtualCamera: cannot read the picture " + dir.file("notes.txt")));
}

TEST(VirtualCameraTest, TheCameraThreadStallsBurstsAndStops) {
    sp<HostWindow> window = new HostWindow(64, 48);
    VirtualCamera camera(kivhost::VirtualCamera_generator(64, 48), 64, 48);
    ASSERT_EQ(camera.connect(window), 0);
    EXPECT_EQ(camera.start(0), BAD_VALUE);
    // Stalled from the start: only bursts get through, exactly.
    camera.stall(true);
    ASSERT_EQ(camera.start(1000), 0);
    EXPECT_EQ(camera.start(1000), INVALID_OPERATION);
    camera.burst(5);
    ASSERT_TRUE(eventually([&] { return camera.framesQueued() == 5; }));
    camera.stop();
    EXPECT_EQ(camera.framesQueued(), 5u);
    // The window (async, three slots) kept the newest; the rest were replaced.
    EXPECT_EQ(window->droppedTotal(), 2u);

    // Running at its rate, then stopped: nothing comes after the stop.
    camera.stall(false);
    ASSERT_EQ(camera.start(1000), 0);
    ASSERT_TRUE(eventually([&] { return camera.framesQueued() >= 8; }));
    camera.stop();
    const uint64_t stopped = camera.framesQueued();
    EXPECT_EQ(window->queuedTotal(), stopped);

    // A window whose consumer is gone ends the thread by itself.
    camera.disconnect();
    sp<IGraphicBufferProducer> producer;
    sp<IGraphicBufferConsumer> raw;
    BufferQueue::createBufferQueue(&producer, &raw);
    sp<BufferItemConsumer> consumer = new BufferItemConsumer(raw, 0);
    ASSERT_EQ(camera.connect(new Surface(producer)), 0);
    consumer.clear();
    ASSERT_EQ(camera.start(1000), 0);
    ASSERT_TRUE(eventually([&] { return camera.ended(); }));
    camera.stop();
    EXPECT_EQ(camera.framesQueued(), stopped);
}

}  // namespace
