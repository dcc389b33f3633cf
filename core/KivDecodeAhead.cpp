#include "core/KivDecodeAhead.h"

#include <pthread.h>
#include <stdint.h>
#include <string.h>
#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>

#include "vccore/vc_error.h"

namespace {

// Rows decoded at a time: one JPEG iMCU row of 4:2:0, as a band pipeline
// asks for them (its bands are whole multiples of this).
const int kRows = 16;
// The kernel's large pages (x86-64, arm64 with 4 KB pages).
const size_t kLargePage = 2 << 20;
// Kept memory given back at a time once handed on.
const size_t kReleaseStep = 2 << 20;

// Kept rows are 64-byte aligned, as the GPU's shared pictures lay theirs out,
// so that the decoder goes on straight into the pipeline's rows.
size_t keptPitch(int width) {
    return ((size_t)width * 4 + 63) / 64 * 64;
}

}  // namespace

KivDecodeAhead::KivDecodeAhead(const unsigned char* bytes, size_t length, size_t budget)
    : KivDecodeAhead(VCStreamReader_open(bytes, length), budget) {
    mBytes = ok() ? bytes : nullptr;
}

KivDecodeAhead::KivDecodeAhead(VCStreamReader* reader, size_t budget) {
    if (reader == nullptr || VCStreamReader_readHeader(reader, &mWidth, &mHeight) != 0) {
        VCStreamReader_close(reader);
        return;
    }
    mPitch = keptPitch(mWidth);
    // Whole decoded bands only, and never more than the picture.
    const size_t rows = std::min((size_t)mHeight, budget / mPitch / kRows * kRows);
    if (rows > 0) {
        // Pages are taken as rows come (in large pages where the kernel has
        // them: a fault per 4 KB would cost a good part of what is gained)
        // and given back as the rows are handed on.
        const size_t page = (size_t)sysconf(_SC_PAGESIZE);
        const size_t size = (rows * mPitch + page - 1) / page * page;
        void* kept = mmap(nullptr, size + kLargePage, PROT_READ | PROT_WRITE,
                          MAP_PRIVATE | MAP_ANONYMOUS | MAP_NORESERVE, -1, 0);
        if (kept != MAP_FAILED) {
            // Large pages start on their own boundary.
            unsigned char* start = static_cast<unsigned char*>(kept);
            const size_t lead = (kLargePage - (uintptr_t)start % kLargePage) % kLargePage;
            if (lead > 0) munmap(start, lead);
            munmap(start + lead + size, kLargePage - lead);
            madvise(start + lead, size, MADV_HUGEPAGE);
            mKept = start + lead;
            mKeptSize = size;
            mKeptCapacity = (int)rows;
        }
    }
    mReader = reader;
    mThread = std::thread([this] {
        pthread_setname_np(pthread_self(), "kiv-decode");
        const int rc =
            VCStreamReader_readBandsInPlace(mReader, kRows, mPitch, onPlace, onPlaced, this);
        std::lock_guard<std::mutex> guard(mLock);
        mStatus = rc;
        mDone = true;
        mChanged.notify_all();
    });
}

KivDecodeAhead::~KivDecodeAhead() {
    if (mThread.joinable()) {
        {
            std::lock_guard<std::mutex> guard(mLock);
            mStop = true;
            mChanged.notify_all();
        }
        mThread.join();
    }
    if (mKept != nullptr) munmap(mKept, mKeptSize);
    VCStreamReader_close(mReader);
}

unsigned char* KivDecodeAhead::onPlace(void* self, int first, int rows) {
    return static_cast<KivDecodeAhead*>(self)->place(first, rows);
}

int KivDecodeAhead::onPlaced(void* self, const unsigned char* rgba, int first, int rows) {
    return static_cast<KivDecodeAhead*>(self)->placed(rgba, first, rows);
}

unsigned char* KivDecodeAhead::place(int first, int rows) {
    std::unique_lock<std::mutex> lock(mLock);
    // Kept while they fit; past the budget, the decoder waits for the
    // consumer.
    const bool fits = first + rows <= mKeptCapacity;
    if (!fits && !mTakenOver) {
        mWaiting = true;
        mChanged.notify_all();
    }
    mChanged.wait(lock, [&] { return mStop || mTakenOver || fits; });
    mWaiting = false;
    if (mStop) return nullptr;
    if (!mTakenOver) {
        mKeeping = true;
        mWhere = KEPT;
        return mKept + (size_t)first * mPitch;
    }
    const VCStreamPlace consumerPlace = mPlace;
    void* const user = mUser;
    const size_t pitch = mConsumerPitch;
    lock.unlock();
    unsigned char* to = consumerPlace(user, first, rows);
    if (to == nullptr || pitch == mPitch) {
        mWhere = PLACED;
        return to;
    }
    // Rows at another pitch pass through a band of the decoder's own.
    mWhere = RELAYED;
    mRelayTo = to;
    mRelay.resize((size_t)kRows * mPitch);
    return mRelay.data();
}

int KivDecodeAhead::placed(const unsigned char* rgba, int first, int rows) {
    if (mWhere == KEPT) {
        std::lock_guard<std::mutex> guard(mLock);
        mKeptRows = first + rows;
        mKeeping = false;
        mChanged.notify_all();
        return 0;
    }
    // The consumer's fields were set before the decoder saw it take over.
    if (mWhere == RELAYED) {
        for (int i = 0; i < rows; ++i)
            memcpy(mRelayTo + i * mConsumerPitch, rgba + i * mPitch, (size_t)mWidth * 4);
        rgba = mRelayTo;
    }
    return mBand(mUser, rgba, first, rows);
}

int KivDecodeAhead::takeOver(size_t pitch, VCStreamPlace place, VCStreamBand band, void* user) {
    // Once only: the decoder's thread is gone after.
    if (!ok() || !mThread.joinable() || place == nullptr || band == nullptr)
        return VC_ERROR_INVALID_STATE;
    if (pitch < (size_t)mWidth * 4) return VC_ERROR_INVALID_STATE;
    const size_t page = (size_t)sysconf(_SC_PAGESIZE);
    const size_t rowBytes = (size_t)mWidth * 4;
    int handed = 0, refused = 0;
    size_t released = 0;
    std::unique_lock<std::mutex> lock(mLock);
    while (refused == 0) {
        // Rows go on in the order they were decoded: the kept ones first;
        // once none is left (and none is on its way into them) the decoder
        // places the rest itself.
        if (mKeptRows == handed && !mKeeping) {
            if (!mDone) {
                mConsumerPitch = pitch;
                mPlace = place;
                mBand = band;
                mUser = user;
                mTakenOver = true;
                mChanged.notify_all();
            }
            break;
        }
        if (mKeptRows == handed) {
            mChanged.wait(lock);
            continue;
        }
        const int end = mKeptRows;
        lock.unlock();
        for (int first = handed; refused == 0 && first < end; first += kRows) {
            const int rows = std::min(kRows, end - first);
            unsigned char* to = place(user, first, rows);
            if (to == nullptr) {
                refused = VC_ERROR_INVALID_STATE;
                break;
            }
            for (int i = 0; i < rows; ++i)
                memcpy(to + i * pitch, mKept + (size_t)(first + i) * mPitch, rowBytes);
            refused = band(user, to, first, rows);
        }
        // What is handed on gives its memory back, in large steps: each
        // one interrupts every core that runs a thread of ours.
        const size_t done = (size_t)end * mPitch / page * page;
        if (done >= released + kReleaseStep) {
            madvise(mKept + released, done - released, MADV_DONTNEED);
            released = done;
        }
        handed = end;
        lock.lock();
    }
    if (refused != 0) {
        mStop = true;
        mChanged.notify_all();
    }
    // No row is kept any more.
    if (mKeptSize > released) madvise(mKept + released, mKeptSize - released, MADV_DONTNEED);
    mChanged.wait(lock, [&] { return mDone; });
    lock.unlock();
    mThread.join();
    return refused != 0 ? refused : mStatus;
}

int KivDecodeAhead::keptRowsWhenWaiting() {
    std::unique_lock<std::mutex> lock(mLock);
    mChanged.wait(lock, [&] { return mDone || mWaiting || mStop; });
    return mKeptRows;
}
