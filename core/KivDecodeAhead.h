// A picture that starts decoding on a thread of its own as soon as it is
// known, while the GL side is still starting (loading the driver, making the
// context and the program take tens of milliseconds on a host): its first
// rows are kept, up to a budget, until a band pipeline takes the picture
// over; from then on each row is decoded straight where the pipeline places
// it.
#ifndef KIV_CORE_KIVDECODEAHEAD_H
#define KIV_CORE_KIVDECODEAHEAD_H

#include <stddef.h>

#include <condition_variable>
#include <mutex>
#include <thread>
#include <vector>

#include "vccore/vc_stream.h"

class KivDecodeAhead {
public:
    // Reads the header of `length` bytes of JPEG or PNG data (which must
    // outlive this) and starts decoding, keeping at most `budget` bytes of
    // rows; ok() is false, with nothing started, when the header does not
    // read.
    KivDecodeAhead(const unsigned char* bytes, size_t length, size_t budget);
    // The same for a reader opened on its bytes (taken over; its header not
    // read yet), such as one pulling them from a file as it decodes.
    KivDecodeAhead(VCStreamReader* reader, size_t budget);
    // Stops a decoding nobody took over and waits for its thread.
    ~KivDecodeAhead();

    bool ok() const { return mReader != nullptr; }
    // The bytes it was made from; null for a reader.
    const unsigned char* bytes() const { return mBytes; }
    int width() const { return mWidth; }
    int height() const { return mHeight; }

    // Once, on the consumer's thread: the rows kept so far, then every row
    // as it is decoded, under the contract of VCStreamReader_readBandsInPlace
    // (`place` says where rows go, `pitch` bytes apart; `band` is told once
    // they are there). Returns when the decoding ends: 0, the band's refusal,
    // VC_ERROR_INVALID_STATE when `place` refused, or VC_ERROR_CODEC_FAILED
    // (failure() says why).
    int takeOver(size_t pitch, VCStreamPlace place, VCStreamBand band, void* user);
    // After takeOver: why the picture did not decode.
    VCDecodeFailure failure() const { return VCStreamReader_failure(mReader); }

    // For tests: once the decoder has filled its budget or ended, the rows
    // it keeps.
    int keptRowsWhenWaiting();

    KivDecodeAhead(const KivDecodeAhead&) = delete;
    KivDecodeAhead& operator=(const KivDecodeAhead&) = delete;

private:
    static unsigned char* onPlace(void* self, int first, int rows);
    static int onPlaced(void* self, const unsigned char* rgba, int first, int rows);
    unsigned char* place(int first, int rows);
    int placed(const unsigned char* rgba, int first, int rows);

    const unsigned char* mBytes = nullptr;
    VCStreamReader* mReader = nullptr;
    int mWidth = 0;
    int mHeight = 0;
    // The first rows of the picture, as many as the budget holds, mPitch
    // bytes apart.
    unsigned char* mKept = nullptr;
    size_t mKeptSize = 0;   // whole pages
    int mKeptCapacity = 0;  // rows
    size_t mPitch = 0;
    std::thread mThread;

    // The decoder's own: where its current rows went (the kept rows, the
    // consumer's place, or a band of its own when the consumer's pitch is
    // not the kept rows' one) and the consumer's place for them.
    enum Where { KEPT, PLACED, RELAYED } mWhere = KEPT;
    unsigned char* mRelayTo = nullptr;
    std::vector<unsigned char> mRelay;

    std::mutex mLock;
    std::condition_variable mChanged;
    int mKeptRows = 0;        // rows [0, mKeptRows) kept
    bool mKeeping = false;    // rows being decoded into the kept ones
    bool mWaiting = false;    // the decoder waits for room
    bool mTakenOver = false;  // rows go to the consumer as decoded
    bool mStop = false;
    bool mDone = false;
    int mStatus = 0;
    size_t mConsumerPitch = 0;
    VCStreamPlace mPlace = nullptr;
    VCStreamBand mBand = nullptr;
    void* mUser = nullptr;
};

#endif
