#include "core/KivBandPipeline.h"

#include <pthread.h>
#include <string.h>

#include <algorithm>
#include <atomic>
#include <thread>
#include <vector>

#include "core/egl/EglNativeSeam.h"
#include "core/egl/EglProgram.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_error.h"
#include "vccore/vc_image.h"
#include "vccore/vc_log.h"

#define VC_SOURCE "core/KivBandPipeline"

namespace {

// Rows the decoder hands over at a time: one JPEG iMCU row of 4:2:0, and an
// even count for NV21.
const int kDecodeRows = 16;
// Drawn bands the encoder may lag behind, and decoded ones the decoder may
// run ahead: enough to keep each stage busy while the next waits.
const int kBandsInFlight = 2;
// llvmpipe renders 64x64 tiles: bands of whole tiles never share one.
const int kTileRows = 64;

using ImageHandle = std::unique_ptr<VCImage, void (*)(VCImage*)>;

ImageHandle wrap(unsigned char* data, int width, int height, uint32_t format) {
    return ImageHandle(VCImage_createWrap(data, width, height, format,
                                          (int)VCImage_requiredSize(width, height, format), 0),
                       VCImage_destroy);
}

}  // namespace

KivBandPipeline::KivBandPipeline(EglProgram& program, EglSharedPicture& source,
                                 EglSharedPicture& target, const Picture& picture)
    : mProgram(program),
      mSource(source),
      mTarget(target),
      mPicture(picture),
      mBandRows(bandRows(picture.width)) {}

namespace {
std::atomic<int> gBandRowsForTesting{0};
}  // namespace

void KivBandPipeline::setBandRowsForTesting(int rows) {
    gBandRowsForTesting = rows;
}

int KivBandPipeline::bandRows(int width) {
    if (gBandRowsForTesting.load() > 0) return gBandRowsForTesting.load();
    const int rows = (4 << 20) / 4 / std::max(width, 1);
    return std::max(kTileRows, rows / kTileRows * kTileRows);
}

void KivBandPipeline::fail(int status) {
    std::lock_guard<std::mutex> guard(mLock);
    if (mStatus == 0) mStatus = status;
    mChanged.notify_all();
}

int KivBandPipeline::onDecoded(void* self, const unsigned char* rgba, int first, int rows) {
    return static_cast<KivBandPipeline*>(self)->storeRows(rgba, first, rows);
}

int KivBandPipeline::storeRows(const unsigned char* rgba, int first, int rows) {
    {
        // Room: no further ahead of the drawn rows than the bands in flight
        // and the reach of the next band need.
        std::unique_lock<std::mutex> lock(mLock);
        mChanged.wait(lock, [&] {
            return mStatus != 0 ||
                   first + rows <= mDrawn + kBandsInFlight * mBandRows + mPicture.haloRows;
        });
        if (mStatus != 0) return mStatus;
    }
    const int w = mPicture.width;
    const size_t rowBytes = (size_t)w * 4;
    const unsigned char* rowsToCopy = rgba;
    if (mPicture.throughNv21) {
        // As the whole picture would: decoded RGBA to NV21, which the GPU
        // side turns back into RGBA with the image core's equations.
        const bool direct = mSource.pitch() == rowBytes;
        mNv21.resize(VCImage_requiredSize(w, rows, VC_FORMAT_NV21));
        if (!direct) mRgba.resize(rowBytes * rows);
        unsigned char* back = direct ? mSource.row(first) : mRgba.data();
        ImageHandle from = wrap(const_cast<unsigned char*>(rgba), w, rows, VC_FORMAT_RGBA);
        ImageHandle nv21 = wrap(mNv21.data(), w, rows, VC_FORMAT_NV21);
        ImageHandle to = wrap(back, w, rows, VC_FORMAT_RGBA);
        if (from == nullptr || nv21 == nullptr || to == nullptr ||
            VCImage_convert(from.get(), nv21.get()) != 0 ||
            VCImage_convert(nv21.get(), to.get()) != 0) {
            return VC_REPORT(VC_ERROR_ALLOC_FAILED);
        }
        rowsToCopy = direct ? nullptr : back;
    }
    for (int i = 0; rowsToCopy != nullptr && i < rows; ++i)
        memcpy(mSource.row(first + i), rowsToCopy + i * rowBytes, rowBytes);
    std::lock_guard<std::mutex> guard(mLock);
    mDecoded = first + rows;
    mChanged.notify_all();
    return 0;
}

void KivBandPipeline::decode(VCStreamReader* reader) {
    int rc = VCStreamReader_readBands(reader, kDecodeRows, onDecoded, this);
    if (rc != 0) fail(rc);
}

void KivBandPipeline::encode(VCStreamWriter* writer) {
    for (int y = 0; y < mPicture.height;) {
        int drawn;
        {
            std::unique_lock<std::mutex> lock(mLock);
            mChanged.wait(lock, [&] { return mStatus != 0 || mDrawn > y; });
            if (mStatus != 0) return;
            drawn = mDrawn;
        }
        if (VCStreamWriter_writeRows(writer, mTarget.row(y), mTarget.pitch(), drawn - y) != 0) {
            fail(VC_ERROR_CODEC_FAILED);
            return;
        }
        y = drawn;
        mTarget.discardRowsBelow(y);
        std::lock_guard<std::mutex> guard(mLock);
        mEncoded = y;
        mChanged.notify_all();
    }
}

int KivBandPipeline::draw() {
    const int w = mPicture.width, h = mPicture.height, halo = mPicture.haloRows;
    // The quad covers every pixel where the program draws it; an effect that
    // draws by itself finds opaque black, as in a whole-picture draw.
    const bool clear = !mProgram.getDrawFlag();
    glEnable(GL_SCISSOR_TEST);
    for (int y0 = 0; y0 < h; y0 += mBandRows) {
        const int y1 = std::min(h, y0 + mBandRows);
        {
            std::unique_lock<std::mutex> lock(mLock);
            mChanged.wait(lock, [&] {
                return mStatus != 0 || (mDecoded >= std::min(h, y1 + halo) &&
                                        mEncoded >= y0 - kBandsInFlight * mBandRows);
            });
            if (mStatus != 0) break;
        }
        glScissor(0, y0, w, y1 - y0);
        if (clear) {
            glClearColor(0, 0, 0, 1);
            glClear(GL_COLOR_BUFFER_BIT);
        }
        // One frame in parts: the effect's per-frame hook runs once, for the
        // first band; effects that draw by themselves draw every band.
        int drawn = y0 == 0 || clear ? mProgram.onDrawFrame() : mProgram.redrawFrame();
        glFinish();
        if (drawn != 0) {
            fail(VC_REPORT(VC_ERROR_UNKNOWN));
            break;
        }
        // Rows no later band reads give their memory back.
        if (y1 - halo > 0) mSource.discardRowsBelow(y1 - halo);
        std::lock_guard<std::mutex> guard(mLock);
        mDrawn = y1;
        mChanged.notify_all();
    }
    glDisable(GL_SCISSOR_TEST);
    std::lock_guard<std::mutex> guard(mLock);
    return mStatus;
}

int KivBandPipeline::run(VCStreamReader* reader, VCStreamWriter* writer) {
    std::thread decoder([this, reader] {
        pthread_setname_np(pthread_self(), "kiv-decode");
        decode(reader);
    });
    std::thread encoder([this, writer] {
        pthread_setname_np(pthread_self(), "kiv-encode");
        encode(writer);
    });
    int rc = draw();
    decoder.join();
    encoder.join();
    std::lock_guard<std::mutex> guard(mLock);
    return rc != 0 ? rc : mStatus;
}
