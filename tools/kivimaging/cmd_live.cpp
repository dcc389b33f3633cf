// kivimaging live: the live pipeline on a Linux machine. A virtual camera
// feeds the render manager, which draws the effect into a preview window
// this command reads (and may save), records through the recording path
// into the host video encoder, and takes pictures and snapshots through the
// capture path.
#include <errno.h>
#include <stdio.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <condition_variable>
#include <memory>
#include <mutex>
#include <thread>
#include <vector>

#include <gui/HostWindow.h>
#include <gui/Surface.h>

#include "args.h"
#include "cli.h"
#include "cli_log.h"
#include "core/KivImaging.h"
#include "core/egl/ImageConverter.h"
#include "effects.h"
#include "image_io.h"
#include "kivhost/VideoEncoder.h"
#include "kivhost/VirtualCamera.h"
#include "kivimaging/OpenGLManager.h"
#include "live_stats.h"
#include "progress.h"

using android::sp;

namespace kivcli {
namespace {

const char kHelp[] =
    "Usage: kivimaging live [-e EFFECT] [-p PARAMETERS] [--camera bars|FOLDER|VIDEO]\n"
    "         [--size WxH] [--fps N] [--frames N | --seconds S] [--record OUT.mp4]\n"
    "         [--record-interval MS] [--preview OUT.mp4|DIR] [--picture-at N -o PICTURE.jpg]\n"
    "         [--snapshot-at N -o SNAP.png] [--switch-every N] [--mode direct|fbo]\n"
    "\n"
    "Runs the live pipeline: a virtual camera feeds the render manager, which\n"
    "draws the effect into a preview at about 24 frames a second.\n"
    "\n"
    "  -e, --effect EFFECT      the effect (as for 'apply'; default 400, no effect)\n"
    "  -p, --parameter TEXT     option string for adjustable effects\n"
    "  --camera SOURCE          'bars' (moving colour bars, the default), a folder of\n"
    "                           JPEG/PNG pictures (in turn), or a video file (until\n"
    "                           its end)\n"
    "  --size WxH               camera and preview size, even (default 1280x720)\n"
    "  --fps N                  camera frames a second, 1-120 (default 24)\n"
    "  --frames N               stop after N rendered frames (default 120)\n"
    "  --seconds S              stop after S seconds instead\n"
    "  --record OUT.mp4         record through the recording path (H.264 MP4)\n"
    "  --record-interval MS     record one frame each MS milliseconds (time-lapse)\n"
    "  --preview OUT.mp4|DIR    save the preview as a video, or as numbered PNGs in DIR\n"
    "  --picture-at N -o FILE   at rendered frame N, a picture of the camera frame\n"
    "                           through the effect (.jpg or .png)\n"
    "  --snapshot-at N -o FILE  at rendered frame N, a snapshot of the preview\n"
    "  --switch-every N         move on to the next effect every N rendered frames\n"
    "  --mode direct|fbo        draw the effect straight into the preview (the\n"
    "                           default), or into an intermediate image that is\n"
    "                           copied to the preview and the recording; that image\n"
    "                           has at most 1080 rows (taller sizes are drawn at\n"
    "                           1080 rows and scaled up; the recording keeps --size)\n"
    "  -v, --verbose            show the library's log on standard error\n"
    "\n"
    "At the end it prints: frames: R rendered, D dropped; interval p50 X ms, p99 Y ms;\n"
    "recorded N frames to OUT.mp4. D counts camera frames that were never rendered;\n"
    "intervals are between preview frames, after the first eleven (which the\n"
    "manager draws without pacing).\n"
    "Exit status: 0 done, 1 the pipeline or an output failed, 2 bad arguments.\n";

const OptionSpec kOptions[] = {
    {'h', "help", false},     {'v', "verbose", false},      {'e', "effect", true},
    {'p', "parameter", true}, {0, "camera", true},          {0, "size", true},
    {0, "fps", true},         {0, "frames", true},          {0, "seconds", true},
    {0, "record", true},      {0, "record-interval", true}, {0, "preview", true},
    {0, "picture-at", true},  {0, "snapshot-at", true},     {0, "switch-every", true},
    {0, "picture-out", true}, {0, "snapshot-out", true},    {0, "mode", true},
};

// The unpaced frames the manager draws at start-up.
const uint64_t kWarmUpFrames = 11;

bool endsWith(const std::string& text, const char* suffix) {
    const size_t n = strlen(suffix);
    return text.size() >= n && strcasecmp(text.c_str() + text.size() - n, suffix) == 0;
}

bool isDirectory(const std::string& path) {
    struct stat st;
    return stat(path.c_str(), &st) == 0 && S_ISDIR(st.st_mode);
}

// "-o FILE" belongs to the capture option before it: rewritten as
// --picture-out or --snapshot-out. False when one comes before any.
bool bindOutputs(int argc, char** argv, std::vector<std::string>* out, std::string* error) {
    std::string capture;
    for (int i = 0; i < argc; ++i) {
        std::string arg = argv[i];
        if (arg == "--picture-at" || arg == "--snapshot-at")
            capture = arg.substr(2, arg.find('-', 2) - 2);
        std::string value;
        bool isOutput = false;
        if ((arg == "-o" || arg == "--output") && i + 1 < argc) {
            isOutput = true;
            value = argv[++i];
        } else if (arg.rfind("--output=", 0) == 0 || (arg.rfind("-o", 0) == 0 && arg.size() > 2)) {
            isOutput = true;
            value = arg.substr(arg[1] == '-' ? 9 : 2);
        }
        if (!isOutput) {
            out->push_back(arg);
            continue;
        }
        if (capture.empty()) {
            *error = "-o names the file of --picture-at or --snapshot-at, given before it";
            return false;
        }
        out->push_back("--" + capture + "-out");
        out->push_back(value);
    }
    return true;
}

// Receives one picture and saves it.
class SaveListener : public OnFrameListener {
public:
    explicit SaveListener(const std::string& path) : mPath(path) {}
    void onFrameProcessed(const VCImage& image, long long) override {
        std::string error;
        const bool saved = imageSave(&image, mPath, 95, &error);
        finish(saved ? "" : error.empty() ? "cannot write '" + mPath + "'" : error);
    }
    uint32_t getPreferredFormat() override { return VC_FORMAT_RGBA; }
    void onProcessingError(int code, const char* message) override {
        finish("'" + mPath + "': " + (message != nullptr ? message : "") + " (" +
               std::to_string(code) + ")");
    }
    // Until the picture came (or failed), 10 s at most: "" or why not.
    std::string wait() {
        std::unique_lock<std::mutex> lock(mLock);
        if (!mCond.wait_for(lock, std::chrono::seconds(10), [&] { return mDone; })) {
            return "no picture came for '" + mPath + "'";
        }
        return mError;
    }

private:
    void finish(const std::string& error) {
        std::lock_guard<std::mutex> guard(mLock);
        if (mDone) return;
        mDone = true;
        mError = error;
        mCond.notify_all();
    }
    const std::string mPath;
    std::mutex mLock;
    std::condition_variable mCond;
    bool mDone = false;
    std::string mError;
};

struct Options {
    std::string effect = "400";
    std::string parameter;
    std::string camera = "bars";
    int width = 1280, height = 720;
    int fps = 24;
    int frames = 120;
    double seconds = 0;
    std::string record;
    int recordInterval = -1;
    std::string preview;
    int pictureAt = 0, snapshotAt = 0;
    std::string pictureOut, snapshotOut;
    int switchEvery = 0;
    OpenGLManagerMode mode = OPENGL_MANAGER_DIRECT;
};

int parseOptions(const ParsedArgs& args, Options* o) {
    auto bad = [](const std::string& message) { return usageError("live", message); };
    o->effect = args.get("effect", o->effect);
    o->parameter = args.get("parameter");
    o->camera = args.get("camera", o->camera);
    if (args.has("size") && (!parseSize(args.get("size"), 16, 4096, &o->width, &o->height) ||
                             ((o->width | o->height) & 1))) {
        return bad("--size must be WxH, even sides from 16 to 4096");
    }
    if (args.has("fps") && !parseInt(args.get("fps"), 1, 120, &o->fps)) {
        return bad("--fps must be a number from 1 to 120");
    }
    if (args.has("frames") && args.has("seconds"))
        return bad("give --frames or --seconds, not both");
    if (args.has("frames") && !parseInt(args.get("frames"), 1, 10000000, &o->frames)) {
        return bad("--frames must be a number from 1 to 10000000");
    }
    if (args.has("seconds")) {
        char* end = nullptr;
        const std::string text = args.get("seconds");
        o->seconds = strtod(text.c_str(), &end);
        if (text.empty() || *end != '\0' || !(o->seconds > 0 && o->seconds <= 86400)) {
            return bad("--seconds must be a number above 0 (at most a day)");
        }
    }
    o->record = args.get("record");
    if (args.has("record") && !endsWith(o->record, ".mp4"))
        return bad("--record must name an .mp4 file");
    if (args.has("record-interval")) {
        if (!args.has("record")) return bad("--record-interval needs --record");
        if (!parseInt(args.get("record-interval"), 1, 3600000, &o->recordInterval)) {
            return bad("--record-interval must be a number of milliseconds from 1 to 3600000");
        }
    }
    o->preview = args.get("preview");
    if (args.has("preview") && o->preview.empty()) return bad("--preview needs a file or folder");
    struct {
        const char* at;
        const char* out;
        int* frame;
        std::string* path;
    } captures[] = {{"picture-at", "picture-out", &o->pictureAt, &o->pictureOut},
                    {"snapshot-at", "snapshot-out", &o->snapshotAt, &o->snapshotOut}};
    for (const auto& c : captures) {
        if (!args.has(c.at)) continue;
        if (!parseInt(args.get(c.at), 1, 10000000, c.frame)) {
            return bad(std::string("--") + c.at + " must be a frame number from 1");
        }
        *c.path = args.get(c.out);
        if (c.path->empty()) return bad(std::string("--") + c.at + " needs -o FILE after it");
        if (!imageWritableFormat(*c.path))
            return bad("'" + *c.path + "' must end in .png, .jpg or .jpeg");
    }
    if (args.has("switch-every") &&
        !parseInt(args.get("switch-every"), 1, 10000000, &o->switchEvery)) {
        return bad("--switch-every must be a number from 1");
    }
    if (args.has("mode")) {
        const std::string mode = args.get("mode");
        if (mode != "direct" && mode != "fbo") return bad("--mode must be direct or fbo");
        o->mode = mode == "fbo" ? OPENGL_MANAGER_INTERMEDIATE : OPENGL_MANAGER_DIRECT;
    }
    return kExitOk;
}

std::unique_ptr<kivhost::VirtualCameraSource> openCamera(const Options& o, std::string* error) {
    std::unique_ptr<kivhost::VirtualCameraSource> source;
    if (o.camera == "bars") {
        source = kivhost::VirtualCamera_generator(o.width, o.height);
    } else if (isDirectory(o.camera)) {
        source = kivhost::VirtualCamera_folder(o.camera, o.width, o.height);
        if (source == nullptr) *error = "no JPEG or PNG picture can be read in '" + o.camera + "'";
    } else {
        source = kivhost::VirtualCamera_video(o.camera, o.width, o.height, false);
        if (source == nullptr) *error = "cannot play '" + o.camera + "' as a video";
    }
    return source;
}

// An effect the manager draws: owned here, handed over as a KivImaging.
struct LiveEffect {
    LiveEffect(const EffectChoice& choice, const std::string& parameter) {
        filter = choice.library.empty()
                     ? KivImaging_create(choice.id, nullptr)
                     : KivImaging_create(2000, const_cast<char*>(choice.library.c_str()));
        if (filter != nullptr && !parameter.empty()) {
            KivImaging_setOptionByNameS(filter, "parameter", parameter.c_str());
        }
        imaging.setFilter(filter);
        label = choice.label;
    }
    ~LiveEffect() { KivImaging_destroy(filter); }
    KivFilter* filter;
    KivImaging imaging;
    std::string label;
};

// The preview frames, as the window gets them; saved when asked.
class PreviewSink {
public:
    bool open(const Options& o, std::string* error) {
        if (o.preview.empty()) return true;
        if (endsWith(o.preview, ".mp4")) {
            kivhost::VideoEncoderSettings s;
            s.width = o.width;
            s.height = o.height;
            s.fps = o.fps;
            int status = 0;
            mEncoder = kivhost::VideoEncoder::open(o.preview, s, &status);
            if (mEncoder == nullptr) {
                *error = "cannot write the preview video '" + o.preview + "'";
                return false;
            }
            mSurface = new android::Surface(mEncoder->getProducer());
            native_window_api_connect(mSurface.get(), NATIVE_WINDOW_API_CPU);
            native_window_set_usage(mSurface.get(), android::GraphicBuffer::USAGE_SW_WRITE_OFTEN);
            return true;
        }
        if (!isDirectory(o.preview) && mkdir(o.preview.c_str(), 0777) != 0) {
            *error = "cannot create the folder '" + o.preview + "': " + strerror(errno);
            return false;
        }
        mFolder = o.preview;
        return true;
    }
    // One RGBA frame (rows `stride` pixels apart).
    bool put(const uint8_t* rgba, int width, int height, int stride, int64_t timestamp,
             std::string* error) {
        if (mSurface != nullptr) {
            ANativeWindow* w = mSurface.get();
            ANativeWindowBuffer* native = nullptr;
            int fence = -1;
            if (w->dequeueBuffer(w, &native, &fence) != 0)
                return fail("the preview video stopped", error);
            android::GraphicBuffer* buffer = android::GraphicBuffer::from(native);
            void* pixels = nullptr;
            if (buffer->lock(android::GraphicBuffer::USAGE_SW_WRITE_OFTEN, &pixels) != 0) {
                w->cancelBuffer(w, native, -1);
                return fail("the preview video stopped", error);
            }
            for (int y = 0; y < height; ++y) {
                memcpy((uint8_t*)pixels + (size_t)y * buffer->getStride() * 4,
                       rgba + (size_t)y * stride * 4, (size_t)width * 4);
            }
            buffer->unlock();
            native_window_set_buffers_timestamp(w, timestamp);
            if (w->queueBuffer(w, native, -1) != 0) return fail("the preview video stopped", error);
        } else if (!mFolder.empty()) {
            std::vector<uint8_t> packed((size_t)width * height * 4);
            for (int y = 0; y < height; ++y) {
                memcpy(&packed[(size_t)y * width * 4], rgba + (size_t)y * stride * 4,
                       (size_t)width * 4);
            }
            ImageHolder image(
                VCImage_createWrap(packed.data(), width, height, VC_FORMAT_RGBA, 0, 0));
            char name[32];
            snprintf(name, sizeof(name), "/frame_%05d.png", ++mSaved);
            if (!imageSave(image.get(), mFolder + name, 95, error)) return false;
        }
        return true;
    }
    // 0 or the video's error.
    int close() { return mEncoder != nullptr ? mEncoder->close() : 0; }

private:
    static bool fail(const char* what, std::string* error) {
        *error = what;
        return false;
    }
    std::unique_ptr<kivhost::VideoEncoder> mEncoder;
    sp<android::Surface> mSurface;
    std::string mFolder;
    int mSaved = 0;
};

}  // namespace

int cmdLive(int argc, char** argv) {
    std::vector<std::string> rewritten;
    std::string error;
    if (!bindOutputs(argc, argv, &rewritten, &error)) return usageError("live", error);
    std::vector<char*> args2;
    for (std::string& a : rewritten) args2.push_back(&a[0]);
    ParsedArgs args;
    if (!parseArgs((int)args2.size(), args2.data(), 1, kOptions,
                   sizeof(kOptions) / sizeof(kOptions[0]), &args, &error)) {
        return usageError("live", error);
    }
    if (args.has("help")) {
        fputs(kHelp, stdout);
        return kExitOk;
    }
    if (!args.positionals.empty())
        return usageError("live", "unexpected argument '" + args.positionals[0] + "'");
    Options o;
    int rc = parseOptions(args, &o);
    if (rc != kExitOk) return rc;
    cliLogSetup(args.has("verbose"));
    kivhost::HostVideo_setVerbose(args.has("verbose"));

    EffectChoice choice;
    if (!effectResolve(o.effect, &choice, &error)) return usageError("live", error);
    std::vector<std::unique_ptr<LiveEffect>> effects;
    effects.emplace_back(new LiveEffect(choice, o.parameter));
    if (effects[0]->filter == nullptr)
        return failure("the effect " + choice.label + " cannot be made");
    std::vector<EffectInfo> cycle;
    if (o.switchEvery > 0) {
        for (const EffectInfo& info : effectList()) {
            if (info.id >= 400) cycle.push_back(info);
        }
    }

    std::unique_ptr<kivhost::VirtualCameraSource> source = openCamera(o, &error);
    if (source == nullptr) return failure(error.empty() ? "cannot make the camera" : error);
    PreviewSink sink;
    if (!sink.open(o, &error)) return failure(error);
    std::unique_ptr<kivhost::VideoEncoder> recorder;
    if (!o.record.empty()) {
        kivhost::VideoEncoderSettings s;
        s.width = o.width;
        s.height = o.height;
        s.fps = o.fps;
        recorder = kivhost::VideoEncoder::open(o.record, s);
        if (recorder == nullptr) return failure("cannot write the recording '" + o.record + "'");
    }

    kivhost::VirtualCamera camera(std::move(source), o.width, o.height);
    sp<android::HostWindow> preview = new android::HostWindow(o.width, o.height);
    sp<OpenGLManager> manager = new OpenGLManager(o.mode, DISPLAY_DEVICE_GPU);
    manager->setCameraSize(o.width, o.height, 0, 0);
    manager->setPreviewWindow(preview, CAMERA_LAYOUT_SINGLE);
    manager->setFilter(&effects[0]->imaging);
    manager->setRecordingInterval(o.recordInterval);
    SaveListener picture(o.pictureOut), snapshot(o.snapshotOut);
    manager->startRenderThread();
    sp<ANativeWindow> cameraWindow = manager->getNewPreviewWindowForOpenGL(0);
    if (cameraWindow == nullptr || camera.connect(cameraWindow) != 0) {
        manager->release();
        return failure("the render thread could not start (see -v)");
    }
    manager->notifyGLSurfaceConnectionComplete();
    camera.start(o.fps);

    using Clock = std::chrono::steady_clock;
    const auto started = Clock::now();
    LiveStats stats(kWarmUpFrames);
    bool recording = false, failed = false;
    uint64_t sentAtWarmUp = 0, renderedAtWarmUp = 0;
    auto idleSince = Clock::now();
    Clock::time_point endedAt;
    const int total = o.seconds > 0 ? (int)(o.seconds * 1000) : o.frames;
    ProgressBar bar(stdout, total, isatty(1) != 0);
    std::vector<std::string> errors;
    size_t effectIndex = 0;
    for (;;) {
        sp<android::GraphicBuffer> frame;
        uint64_t number = 0;
        int64_t timestamp = 0, ready = 0;
        bool any = false;
        // Intervals between the times the frames' pixels were there, where
        // a display could first show them.
        while (preview->acquireFrame(&frame, &number, &timestamp, &ready) == android::NO_ERROR) {
            any = true;
            stats.add(number, ready);
            void* pixels = nullptr;
            if (frame->lock(android::GraphicBuffer::USAGE_SW_READ_OFTEN, &pixels) == 0) {
                if (!sink.put((const uint8_t*)pixels, o.width, o.height, (int)frame->getStride(),
                              timestamp, &error)) {
                    errors.push_back(error);
                    failed = true;
                }
                frame->unlock();
            }
            preview->releaseFrame(frame);
            const uint64_t shown = stats.frames();
            if (shown == kWarmUpFrames) {
                sentAtWarmUp = camera.framesQueued() + camera.framesNotQueued();
                renderedAtWarmUp = preview->queuedTotal();
            }
            if ((int)shown == o.pictureAt) {
                manager->setOnPictureListener(&picture);
                VCImage* empty = VCImage_createEmpty(o.width, o.height, VC_FORMAT_NV21);
                if (manager->applyToPicture(empty, nullptr) != 0) {
                    VCImage_destroy(empty);
                    errors.push_back("the picture could not be asked for");
                } else {
                    manager->onTakePicture(CAPTURE_PICTURE);
                    const std::string e = picture.wait();
                    if (!e.empty()) errors.push_back(e);
                }
            }
            if ((int)shown == o.snapshotAt) {
                manager->setOnPictureListener(&snapshot);
                manager->onTakePicture(CAPTURE_SNAPSHOT);
                const std::string e = snapshot.wait();
                if (!e.empty()) errors.push_back(e);
            }
            if (o.switchEvery > 0 && shown % o.switchEvery == 0 && !cycle.empty()) {
                const EffectInfo& next = cycle[effectIndex++ % cycle.size()];
                EffectChoice c;
                c.id = next.id;
                c.label = std::to_string(next.id) + " " + next.className;
                effects.emplace_back(new LiveEffect(c, ""));
                manager->setFilter(&effects.back()->imaging);
            }
        }
        // The program exists once the first frame is drawn.
        if (recorder != nullptr && !recording && stats.frames() > 0) {
            recording = manager->setRecordingSurface(recorder->getProducer()) == 0;
        }
        const double elapsed = std::chrono::duration<double>(Clock::now() - started).count();
        bar.update(o.seconds > 0 ? (int)(elapsed * 1000) : (int)stats.frames(), "");
        if (any) idleSince = Clock::now();
        const bool enough =
            o.seconds > 0 ? elapsed >= o.seconds : stats.frames() >= (uint64_t)o.frames;
        // The manager keeps drawing the last frame of a camera that ended:
        // stop once it had time to draw that one.
        if (camera.ended() && endedAt == Clock::time_point()) endedAt = Clock::now();
        const bool ended = endedAt != Clock::time_point() &&
                           Clock::now() - endedAt > std::chrono::milliseconds(200);
        const bool stalled = std::chrono::duration<double>(Clock::now() - idleSince).count() > 10;
        if (enough || ended || stalled || failed) {
            if (stalled) errors.push_back("the preview stopped (see -v)");
            break;
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(2));
    }
    bar.finish();
    camera.stop();
    const uint64_t sent = camera.framesQueued() + camera.framesNotQueued() - sentAtWarmUp;
    const uint64_t rendered = preview->queuedTotal();
    if (recording) manager->setRecordingSurface(nullptr);
    manager->release();
    camera.disconnect();
    if (sink.close() != 0) errors.push_back("the preview video could not be finished");
    uint64_t recorded = 0;
    if (recorder != nullptr) {
        if (recorder->close() != 0) errors.push_back("the recording could not be finished");
        recorded = recorder->stats().encoded;
        if (!recording) errors.push_back("recording could not start");
    }
    const uint64_t renderedPaced = rendered - std::min(rendered, renderedAtWarmUp);
    const uint64_t dropped = sent > renderedPaced ? sent - renderedPaced : 0;
    printf("%s\n", liveSummary(rendered, dropped, stats.percentile(50), stats.percentile(99),
                               recorded, o.record)
                       .c_str());
    for (const std::string& e : errors) failure(e);
    return errors.empty() ? kExitOk : kExitFailure;
}

}  // namespace kivcli
