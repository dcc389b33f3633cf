#include "core/KivBandPipeline.h"

#include <limits.h>
#include <pthread.h>
#include <string.h>
#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <thread>
#include <vector>

#include "core/KivDecodeAhead.h"
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
                                 EglSharedPicture& target, const Picture& picture,
                                 const Tiles* tiles)
    : mProgram(program),
      mSource(source),
      mTarget(target),
      mPicture(picture),
      mBandRows(picture.bandRows > 0 ? picture.bandRows : bandRows(picture.width)),
      mTiles(tiles != nullptr ? *tiles : Tiles{nullptr, nullptr, 0, 0, 0}) {}

namespace {
std::atomic<int> gBandRowsForTesting{0};
}  // namespace

void KivBandPipeline::setBandRowsForTesting(int rows) {
    gBandRowsForTesting = rows;
}

int KivBandPipeline::bandRows(int width) {
    if (gBandRowsForTesting.load() > 0) return gBandRowsForTesting.load();
    const int rows = (1 << 20) / 4 / std::max(width, 1);
    return std::max(kTileRows, rows / kTileRows * kTileRows);
}

void KivBandPipeline::fail(int status) {
    std::lock_guard<std::mutex> guard(mLock);
    if (mStatus == 0) mStatus = status;
    wakeReady();
}

void KivBandPipeline::wakeReady() {
    const bool failed = mStatus != 0;
    if (failed || mDrawn >= mDecoderNeedsDrawn) mDecoderWake.notify_one();
    if (failed || mDrawn >= mEncoderNeedsDrawn) mEncoderWake.notify_one();
    if (failed || (mDecoded >= mDrawNeedsDecoded && mEncoded >= mDrawNeedsEncoded))
        mDrawWake.notify_one();
}

int KivBandPipeline::onDecoded(void* self, const unsigned char* rgba, int first, int rows) {
    return static_cast<KivBandPipeline*>(self)->storeRows(rgba, first, rows);
}

unsigned char* KivBandPipeline::onPlace(void* self, int first, int rows) {
    KivBandPipeline* pipeline = static_cast<KivBandPipeline*>(self);
    const int rc = pipeline->makeRoom(first, rows);
    if (rc != 0) {
        pipeline->fail(rc);
        return nullptr;
    }
    return pipeline->mSource.row(first);
}

int KivBandPipeline::onPlaced(void* self, const unsigned char*, int first, int rows) {
    static_cast<KivBandPipeline*>(self)->rowsStored(first + rows);
    return 0;
}

int KivBandPipeline::makeRoom(int first, int rows) {
    // Decoded rows never straddle bands (bands are whole multiples of them).
    const int band = first / mBandRows;
    const bool newBand = mSourceSlots > 0 && first % mBandRows == 0;
    // The band whose memory it takes has no reader left once the rows it
    // reaches are all drawn.
    const int freed = (band - mSourceSlots + 1) * mBandRows + mPicture.haloRows;
    {
        // Room: no further ahead of the drawn rows than the bands in flight
        // and the reach of the next band need.
        std::unique_lock<std::mutex> lock(mLock);
        mDecoderNeedsDrawn = std::max(first + rows - kBandsInFlight * mBandRows - mPicture.haloRows,
                                      newBand ? freed : 0);
        mDecoderWake.wait(lock, [&] { return mStatus != 0 || mDrawn >= mDecoderNeedsDrawn; });
        mDecoderNeedsDrawn = INT_MAX;
        if (mStatus != 0) return mStatus;
    }
    if (newBand && !mSource.takeBand(band)) return VC_REPORT(VC_ERROR_ALLOC_FAILED);
    return 0;
}

void KivBandPipeline::rowsStored(int end) {
    std::lock_guard<std::mutex> guard(mLock);
    mDecoded = end;
    wakeReady();
}

int KivBandPipeline::storeRows(const unsigned char* rgba, int first, int rows) {
    const int room = makeRoom(first, rows);
    if (room != 0) return room;
    const int w = mPicture.width;
    const size_t rowBytes = (size_t)w * 4;
    // As the whole picture would: decoded RGBA to NV21, which the GPU side
    // turns back into RGBA with the image core's equations.
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
    for (int i = 0; !direct && i < rows; ++i)
        memcpy(mSource.row(first + i), back + i * rowBytes, rowBytes);
    rowsStored(first + rows);
    return 0;
}

void KivBandPipeline::decode(VCStreamReader* reader, KivDecodeAhead* ahead) {
    // RGBA rows are decoded straight into the source; rows that cross NV21
    // go through a band of the reader's own.
    const int rc = ahead != nullptr ? ahead->takeOver(mSource.pitch(), onPlace, onPlaced, this)
                   : mPicture.throughNv21
                       ? VCStreamReader_readBands(reader, kDecodeRows, onDecoded, this)
                       : VCStreamReader_readBandsInPlace(reader, kDecodeRows, mSource.pitch(),
                                                         onPlace, onPlaced, this);
    if (rc != 0) fail(rc);
}

void KivBandPipeline::encode(VCStreamWriter* writer) {
    for (int y = 0; y < mPicture.height;) {
        int drawn;
        {
            std::unique_lock<std::mutex> lock(mLock);
            mEncoderNeedsDrawn = y + 1;
            mEncoderWake.wait(lock, [&] { return mStatus != 0 || mDrawn >= mEncoderNeedsDrawn; });
            mEncoderNeedsDrawn = INT_MAX;
            if (mStatus != 0) return;
            drawn = mDrawn;
        }
        if (VCStreamWriter_writeRows(writer, mTarget.row(y), mTarget.pitch(), drawn - y) != 0) {
            fail(VC_ERROR_CODEC_FAILED);
            return;
        }
        y = drawn;
        if (mTargetSlots == 0) mTarget.discardRowsBelow(y);
        std::lock_guard<std::mutex> guard(mLock);
        mEncoded = y;
        wakeReady();
    }
}

int KivBandPipeline::draw() {
    const int w = mPicture.width, h = mPicture.height, halo = mPicture.haloRows;
    // The quad covers every pixel where the program draws it; an effect that
    // draws by itself finds opaque black, as in a whole-picture draw.
    const bool clear = !mProgram.getDrawFlag();
    const bool tiled = mTiles.source != nullptr;
    if (!tiled) glEnable(GL_SCISSOR_TEST);
    for (int y0 = 0; y0 < h; y0 += mBandRows) {
        const int y1 = std::min(h, y0 + mBandRows);
        {
            std::unique_lock<std::mutex> lock(mLock);
            // A band of a target ring takes the memory of one encoded.
            const int encoded = y0 - (mTargetSlots > 0 ? std::min(kBandsInFlight, mTargetSlots - 1)
                                                       : kBandsInFlight) *
                                         mBandRows;
            mDrawNeedsDecoded = std::min(h, y1 + halo);
            mDrawNeedsEncoded = encoded;
            mDrawWake.wait(lock, [&] {
                return mStatus != 0 ||
                       (mDecoded >= mDrawNeedsDecoded && mEncoded >= mDrawNeedsEncoded);
            });
            mDrawNeedsDecoded = mDrawNeedsEncoded = INT_MAX;
            if (mStatus != 0) break;
        }
        if (mTargetSlots > 0 && !mTarget.takeBand(y0 / mBandRows)) {
            fail(VC_REPORT(VC_ERROR_ALLOC_FAILED));
            break;
        }
        int drawn = 0;
        if (tiled) {
            drawn = drawTiles(y0, y1, y0 == 0);
        } else {
            glScissor(0, y0, w, y1 - y0);
            if (clear) {
                glClearColor(0, 0, 0, 1);
                glClear(GL_COLOR_BUFFER_BIT);
            }
            // One frame in parts: the effect's per-frame hook runs once, for
            // the first band; effects that draw by themselves draw every band.
            drawn = y0 == 0 || clear ? mProgram.onDrawFrame() : mProgram.redrawFrame();
            glFinish();
        }
        if (drawn != 0) {
            fail(VC_REPORT(VC_ERROR_UNKNOWN));
            break;
        }
        // Rows no later band reads give their memory back.
        if (mSourceSlots == 0 && y1 - halo > 0) mSource.discardRowsBelow(y1 - halo);
        std::lock_guard<std::mutex> guard(mLock);
        mDrawn = y1;
        wakeReady();
    }
    if (!tiled) glDisable(GL_SCISSOR_TEST);
    std::lock_guard<std::mutex> guard(mLock);
    return mStatus;
}

int KivBandPipeline::drawTiles(int y0, int y1, bool first) {
    const int w = mPicture.width, h = mPicture.height;
    const int haloRows = mPicture.haloRows, haloColumns = mTiles.haloColumns;
    EglSharedPicture& from = *mTiles.source;
    EglSharedPicture& to = *mTiles.target;
    const int sourceWidth = mTiles.sourceWidth, sourceRows = mTiles.sourceRows;
    // A side that fits keeps the picture's own positions; a side that does
    // not is read through the window's mapping.
    const bool allColumns = sourceWidth == w, allRows = sourceRows == h;
    const int tileWidth = allColumns ? w : sourceWidth - 2 * haloColumns;
    const int sy0 = std::max(0, y0 - haloRows), sy1 = std::min(h, y1 + haloRows);
    const int firstRow = allRows ? sy0 : 0, endRow = allRows ? sy1 : sourceRows;
    const bool clear = !mProgram.getDrawFlag();
    for (int x0 = 0; x0 < w; x0 += tileWidth) {
        const int x1 = std::min(w, x0 + tileWidth);
        const int sx0 = std::max(0, x0 - haloColumns), sx1 = std::min(w, x1 + haloColumns);
        const int columns = sx1 - sx0;
        // Past the picture's edges a mapped tile repeats the edge pixels, as
        // clamping does at the edges of the whole picture.
        for (int r = firstRow; r < endRow; ++r) {
            const int y = allRows ? r : std::min(sy0 + r, sy1 - 1);
            uint32_t* row = reinterpret_cast<uint32_t*>(from.row(r));
            memcpy(row, mSource.row(y) + (size_t)sx0 * 4, (size_t)columns * 4);
            std::fill(row + columns, row + sourceWidth, row[columns - 1]);
        }
        // Read positions as texels of the whole picture less the tile's
        // origin, over the tile picture's size: a side that fits a texture
        // keeps its own positions, a mapped side is a power of two (exact).
        const float u0 = (float)x0 / w, u1 = (float)x1 / w;
        const float v0 = (float)y0 / h, v1 = (float)y1 / h;
        const EglProgram::Window window = {
            x1 - x0,
            y1 - y0,
            {u0, v0, u1, v0, u0, v1, u1, v1},
            {allColumns ? 1.0f : (float)w, allRows ? 1.0f : (float)h,
             allColumns ? 0.0f : (float)sx0, allRows ? 0.0f : (float)sy0},
            {allColumns ? 1.0f : 1.0f / sourceWidth, allRows ? 1.0f : 1.0f / sourceRows}};
        mProgram.setWindow(&window);
        if (clear) {
            glClearColor(0, 0, 0, 1);
            glClear(GL_COLOR_BUFFER_BIT);
        }
        // As for bands: the per-frame hook runs for the first tile only.
        const int drawn =
            (first && x0 == 0) || clear ? mProgram.onDrawFrame() : mProgram.redrawFrame();
        glFinish();
        if (drawn != 0) return drawn;
        for (int y = y0; y < y1; ++y)
            memcpy(mTarget.row(y) + (size_t)x0 * 4, to.row(y - y0), (size_t)(x1 - x0) * 4);
    }
    // Rows no later band reads.
    if (allRows && y1 - haloRows > 0) from.discardRowsBelow(y1 - haloRows);
    return 0;
}

int KivBandPipeline::run(VCStreamReader* reader, VCStreamWriter* writer) {
    return start(reader, nullptr, writer);
}

int KivBandPipeline::run(KivDecodeAhead* ahead, VCStreamWriter* writer) {
    return mPicture.throughNv21 ? VC_ERROR_INVALID_STATE : start(nullptr, ahead, writer);
}

int KivBandPipeline::start(VCStreamReader* reader, KivDecodeAhead* ahead, VCStreamWriter* writer) {
    // Rings where they save anything: the source keeps the bands in flight,
    // the one being drawn and the reach on either side of it; the target the
    // band being drawn and those the encoder has not reached.
    const int bands = (mPicture.height + mBandRows - 1) / mBandRows;
    const int reachBands = (mPicture.haloRows + mBandRows - 1) / mBandRows;
    const int sourceSlots = kBandsInFlight + 1 + 2 * reachBands;
    const int targetSlots = kBandsInFlight + 1;
    if (sourceSlots < bands && mSource.useBandRing(mBandRows, sourceSlots))
        mSourceSlots = sourceSlots;
    if (targetSlots < bands && mTarget.useBandRing(mBandRows, targetSlots))
        mTargetSlots = targetSlots;
    std::thread decoder([this, reader, ahead] {
        pthread_setname_np(pthread_self(), ahead != nullptr ? "kiv-hand-on" : "kiv-decode");
        decode(reader, ahead);
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

namespace {

size_t pageSize() {
    return (size_t)sysconf(_SC_PAGESIZE);
}

// Address space that reads as zeros until written.
void* reserve(void* at, size_t bytes) {
    return mmap(at, bytes, PROT_READ | PROT_WRITE,
                MAP_PRIVATE | MAP_ANONYMOUS | MAP_NORESERVE | (at != nullptr ? MAP_FIXED : 0), -1,
                0);
}

}  // namespace

bool KivRowStore::make(int width, int height) {
    mPitch = (size_t)width * 4;
    mSize = (mPitch * (size_t)height + pageSize() - 1) / pageSize() * pageSize();
    void* rows = reserve(nullptr, mSize);
    if (rows == MAP_FAILED) return false;
    mRows = static_cast<unsigned char*>(rows);
    return true;
}

bool KivRowStore::useBandRing(int bandRows, int slots) {
    const size_t bytes = (size_t)bandRows * mPitch;
    if (mRows == nullptr || mBandBytes != 0 || bytes == 0 || bytes % pageSize() != 0 || slots < 1)
        return false;
    mBandBytes = bytes;
    mSlots = slots;
    return true;
}

bool KivRowStore::takeBand(int band) {
    if (mBandBytes == 0 || band < 0 || (size_t)band * mBandBytes >= mSize) return false;
    const int before = band - mSlots;
    if (before < 0) return true;
    unsigned char* from = mRows + (size_t)before * mBandBytes;
    unsigned char* to = mRows + (size_t)band * mBandBytes;
    // The last band may be short of a whole one.
    const size_t bytes = std::min(mBandBytes, mSize - (size_t)band * mBandBytes);
    // The pages move with their page tables; where they cannot, the band
    // before gives its memory back and this one is faulted in afresh.
    if (mremap(from, bytes, bytes, MREMAP_MAYMOVE | MREMAP_FIXED, to) == MAP_FAILED)
        return madvise(from, mBandBytes, MADV_DONTNEED) == 0;
    // What moved away reads as zeros again.
    return reserve(from, bytes) != MAP_FAILED;
}

KivRowStore::~KivRowStore() {
    if (mRows != nullptr) munmap(mRows, mSize);
}

void KivRowStore::discardRowsBelow(int y) {
    const size_t page = pageSize();
    const size_t end = (size_t)y * mPitch / page * page;
    if (end <= mDiscarded) return;
    madvise(mRows + mDiscarded, end - mDiscarded, MADV_DONTNEED);
    mDiscarded = end;
}
