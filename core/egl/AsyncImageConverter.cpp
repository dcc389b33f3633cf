#include "core/egl/AsyncImageConverter.h"

#include <algorithm>
#include <atomic>

#include "core/egl/EglCheck.h"
#include "vccore/vc_convert.h"
#include "vccore/vc_log.h"

#define VC_SOURCE "core/egl/AsyncImageConverter"

using android::Mutex;
using android::WorkQueue;

namespace {

const char* fourcc(const uint32_t& format) {
    return reinterpret_cast<const char*>(&format);
}

// Whether converting a frame band by band gives the bytes of converting it
// whole. A grey source fills a fixed count of chroma bytes from the start of
// the chroma, which in bands lands elsewhere.
bool bandsMatchFrame(uint32_t from, uint32_t to) {
    return from != VC_FORMAT_GREY || !VCImage_isYUV(to) || to == VC_FORMAT_GREY;
}

// A view of rows [row, row + rows) of a frame, or null when the frame's
// layout cannot be expressed as one (two separate chroma planes, chroma
// placed before the band).
VCImage* bandView(const VCImage* frame, int row, int rows) {
    const int64_t width = frame->width;
    if (VCImage_isYUV420(frame->format)) {
        if (frame->format != VC_FORMAT_NV12 && frame->format != VC_FORMAT_NV21) return nullptr;
        const int64_t chroma = frame->uvOffset != 0 ? frame->uvOffset : width * frame->height;
        const int64_t offset = chroma + (row / 2) * width - row * width;
        if (offset <= 0 || offset > UINT32_MAX) return nullptr;
        return VCImage_createWrap(frame->data + row * width, frame->width, rows, frame->format, 0,
                                  static_cast<uint32_t>(offset));
    }
    const int64_t rowBytes = VCImage_requiredSize(2, 2, frame->format) * width / 4;
    return VCImage_createWrap(frame->data + row * rowBytes, frame->width, rows, frame->format, 0,
                              0);
}

// The bands of one frame and what is left of them, shared by the frame's slice
// jobs. Each band is converted a chunk of rows at a time; a job does its own
// band first, then takes the chunks still left in the others. Four fresh
// threads on two cores neither start together nor land evenly: one band a
// thread, a late start or a third band queued on one core kept that core a
// band behind while the other sat idle. This way the threads that do run
// share the frame to within a chunk.
struct SliceSet {
    SliceSet() : count(0), chunkRows(0), chunksDone(0), status(VC_OK) {
        for (int i = 0; i < 4; i++) {
            sources[i] = nullptr;
            destinations[i] = nullptr;
            nextChunk[i] = 0;
        }
    }
    int count;
    int chunkRows;
    VCImage* sources[4];
    VCImage* destinations[4];
    std::atomic<int> nextChunk[4];
    std::atomic<int> chunksDone;
    std::atomic<int> status;  // the first failure, or VC_OK
};

// One band of a frame converted into the same band of the output, with what
// is left of the other bands once it is done. The views stay their
// creator's; the outcome is read after the queue has been joined.
class ConvertSliceJob : public WorkQueue::WorkUnit {
public:
    ConvertSliceJob(SliceSet* set, int band) : mSet(set), mBand(band) {}
    virtual bool run() {
        for (int k = 0; k < mSet->count; k++) convertChunks((mBand + k) % mSet->count);
        return true;
    }

private:
    void convertChunks(int band) {
        const VCImage* source = mSet->sources[band];
        VCImage* destination = mSet->destinations[band];
        const int rows = source->height;
        for (;;) {
            const int row = mSet->nextChunk[band].fetch_add(1) * mSet->chunkRows;
            if (row >= rows) return;
            const int chunkRows = std::min(mSet->chunkRows, rows - row);
            VCImage* from = bandView(source, row, chunkRows);
            VCImage* to = bandView(destination, row, chunkRows);
            int status = from != nullptr && to != nullptr ? VCImage_convert(from, to)
                                                          : VC_ERROR_ALLOC_FAILED;
            VCImage_destroy(from);
            VCImage_destroy(to);
            if (status < 0) {
                int ok = VC_OK;
                mSet->status.compare_exchange_strong(ok, status);
            } else {
                mSet->chunksDone.fetch_add(1);
            }
        }
    }

    SliceSet* mSet;
    const int mBand;
};

}  // namespace

SyncImageConverter::SyncImageConverter() {}

SyncImageConverter::~SyncImageConverter() {}

int SyncImageConverter::convertAndPost(VCImage* image, OnFrameListener& listener, nsecs_t timestamp,
                                       bool takeOwnership) {
    TimeStat probe("convertAndPost", false);
    if (image == nullptr) return VC_REPORT(VC_ERROR_NULL_PARAM);
    Mutex::Autolock lock(mLock);
    const uint32_t format = listener.getPreferredFormat();
    // The buffer is kept from frame to frame while the size stays.
    if (mOutput.data != nullptr &&
        mOutput.size != VCImage_requiredSize(image->width, image->height, format))
        VCImage_deallocate(&mOutput);
    mOutput.width = image->width;
    mOutput.height = image->height;
    mOutput.format = format;
    EglLog(VF_LOG_WARNING, "Converting frame synchronously %4.4s --> %4.4s, TS = %lld",
           fourcc(image->format), fourcc(format), static_cast<long long>(timestamp));
    int status = VCImage_allocate(&mOutput);
    if (status < 0) {
        EglLog(VF_LOG_ERROR, "Failed to allocate image for color conversion: %d", status);
    } else {
        status = VCImage_convert(image, &mOutput);
        if (status < 0) EglLog(VF_LOG_ERROR, "Color conversion failed: %d", status);
    }
    if (status < 0) {
        if (takeOwnership) VCImage_destroy(image);
        return status;
    }
    EglLog(VF_LOG_DEBUG, "[Sync] Time to convert %4.4s --> %4.4s: %d us", fourcc(image->format),
           fourcc(format), probe());
    if (takeOwnership) VCImage_destroy(image);
    listener.onFrameProcessed(mOutput, timestamp);
    return VC_OK;
}

AsyncImageConverter::AsyncImageConverter(int threads)
    : mWorkQueue(threads > 0 ? static_cast<size_t>(threads) : 1, true) {}

AsyncImageConverter::~AsyncImageConverter() {
    // Frames already accepted are delivered rather than dropped.
    mWorkQueue.finish();
}

int AsyncImageConverter::convertAndPost(VCImage* image, OnFrameListener& listener,
                                        nsecs_t timestamp, bool takeOwnership) {
    if (image == nullptr) return VC_REPORT(VC_ERROR_NULL_PARAM);
    if (image->data == nullptr) {
        if (takeOwnership) VCImage_destroy(image);
        return VC_REPORT(VC_ERROR_NULL_PARAM);
    }
    ConvertJob* job = new ConvertJob(image, listener, timestamp, takeOwnership);
    // A copy that could not be made is refused here rather than lost later.
    if (!job->hasSource()) {
        delete job;
        return VC_REPORT(VC_ERROR_ALLOC_FAILED);
    }
    int status = mWorkQueue.schedule(job, 2);
    if (status != 0) {
        EglLog(VF_LOG_ERROR, "EGL: Work queue failed [%s]: %d",
               "virtual int AsyncImageConverter::convertAndPost(VCImage*, OnFrameListener&, "
               "nsecs_t, bool)",
               status);
        delete job;
        return status;
    }
    return VC_OK;
}

AsyncImageConverter::ConvertJob::ConvertJob(VCImage* image, OnFrameListener& listener,
                                            nsecs_t timestamp, bool takeOwnership)
    : mSource(takeOwnership ? image : VCImage_clone(image)),
      mListener(&listener),
      mTimestamp(timestamp),
      mFormat(0) {}

AsyncImageConverter::ConvertJob::~ConvertJob() {
    destroySource();
}

void AsyncImageConverter::ConvertJob::destroySource() {
    VCImage_destroy(mSource);
    mSource = nullptr;
}

int AsyncImageConverter::ConvertJob::sliceCount(int height) {
    if (height > 0 && height % 8 == 0) return 4;
    if (height > 0 && height % 4 == 0) return 2;
    return 0;
}

bool AsyncImageConverter::ConvertJob::run() {
    if (mSource == nullptr || mListener == nullptr) {
        EglLog(VF_LOG_ERROR, "In %s, image (%p) of listener (%p) was NULL",
               "virtual bool AsyncImageConverter::ConvertJob::run()", mSource, mListener);
        return true;
    }
    mFormat = mListener->getPreferredFormat();
    if (mFormat == mSource->format) {
        EglLog(VF_LOG_DEBUG, "Directly passing image %dx%d %4.4s to listener...", mSource->width,
               mSource->height, fourcc(mSource->format));
        mListener->onFrameProcessed(*mSource, mTimestamp);
        destroySource();
        return true;
    }
    if (doConversionExternal() || doConversionSlicesCPU()) return true;
    int status = doConversion();
    if (status < 0) mListener->onProcessingError(status, "Image conversion failed");
    return true;
}

bool AsyncImageConverter::ConvertJob::prepareOutput() {
    VCImage_reset(&mOutput);
    mOutput.width = mSource->width;
    mOutput.height = mSource->height;
    mOutput.format = mFormat;
    return VCImage_requiredSize(mOutput.width, mOutput.height, mOutput.format) != 0;
}

bool AsyncImageConverter::ConvertJob::doConversionExternal() {
    TimeStat probe("doConversionExternal", false);
    // The converter first: without one no output buffer is worth allocating.
    VCConverter* converter =
        VCConverter_create(mSource->width, mSource->height, mSource->format, mFormat);
    if (converter == nullptr) return false;
    int status = VC_ERROR_ALLOC_FAILED;
    if (prepareOutput() && VCImage_allocate(&mOutput) >= 0)
        status = VCConverter_convert(converter, mSource, &mOutput);
    VCConverter_release(converter);
    if (status != VC_OK) {
        VCImage_deallocate(&mOutput);
        return false;
    }
    const uint32_t from = mSource->format;
    destroySource();
    EglLog(VF_LOG_DEBUG, "[Async/External] Time to convert %4.4s --> %4.4s: %d us", fourcc(from),
           fourcc(mFormat), probe());
    mListener->onFrameProcessed(mOutput, mTimestamp);
    VCImage_deallocate(&mOutput);
    return true;
}

int AsyncImageConverter::ConvertJob::chunkRows(int bandRows, int width, uint32_t from,
                                               uint32_t to) {
    // About two megabytes read and written per chunk: a chunk's call (with its
    // debug line) costs a few microseconds against a tenth of a millisecond
    // of converting, and frames up to 1080p keep one chunk a band. Eight at
    // most, which leaves a thread that finishes early at most an eighth of a
    // band to wait for. Even, so that a 4:2:0 chunk starts on a chroma row of
    // its own.
    const uint64_t bytes = static_cast<uint64_t>(VCImage_requiredSize(width, bandRows, from)) +
                           VCImage_requiredSize(width, bandRows, to);
    const int chunks = static_cast<int>(std::min<uint64_t>(std::max<uint64_t>(bytes >> 21, 1), 8));
    int rows = (bandRows + chunks - 1) / chunks;
    rows += rows % 2;
    return std::max(std::min(rows, bandRows), 1);
}

bool AsyncImageConverter::ConvertJob::doConversionSlicesCPU() {
    TimeStat probe("doConversionSlicesCPU", false);
    const int count = sliceCount(mSource->height);
    if (count == 0 || mSource->data == nullptr || !bandsMatchFrame(mSource->format, mFormat))
        return false;
    if (!prepareOutput() || VCImage_allocate(&mOutput) < 0) return false;

    const int rows = mSource->height / count;
    SliceSet set;
    set.count = count;
    set.chunkRows = chunkRows(rows, mSource->width, mSource->format, mFormat);
    const int chunks = count * ((rows + set.chunkRows - 1) / set.chunkRows);
    bool cut = true;
    for (int i = 0; i < count && cut; i++) {
        set.sources[i] = bandView(mSource, i * rows, rows);
        set.destinations[i] = bandView(&mOutput, i * rows, rows);
        cut = set.sources[i] != nullptr && set.destinations[i] != nullptr;
    }
    if (cut) {
        WorkQueue queue(4, true);
        for (int i = 0; i < count; i++) {
            ConvertSliceJob* job = new ConvertSliceJob(&set, i);
            if (queue.schedule(job, 2) != 0) {
                delete job;
                break;
            }
        }
        queue.finish();
    }
    for (int i = 0; i < count; i++) {
        VCImage_destroy(set.sources[i]);
        VCImage_destroy(set.destinations[i]);
    }
    // A band that failed leaves the whole frame to the plain path, which
    // reports the failure. Every chunk converted is a whole frame even when
    // not every job could be scheduled: the others took its band.
    if (!cut || set.status.load() != VC_OK || set.chunksDone.load() != chunks) {
        VCImage_deallocate(&mOutput);
        return false;
    }
    EglLog(VF_LOG_DEBUG, "[Async/Slices] Time to convert %4.4s --> %4.4s: %d ms",
           fourcc(mSource->format), fourcc(mFormat), probe() / 1000);
    mListener->onFrameProcessed(mOutput, mTimestamp);
    VCImage_deallocate(&mOutput);
    destroySource();
    return true;
}

int AsyncImageConverter::ConvertJob::doConversion() {
    TimeStat probe("doConversion", false);
    prepareOutput();
    int status = VCImage_allocate(&mOutput);
    if (status < 0) {
        EglLog(VF_LOG_ERROR, "%s: Allocation failed.",
               "int AsyncImageConverter::ConvertJob::doConversion()");
        destroySource();
        return status;
    }
    status = VCImage_convert(mSource, &mOutput);
    const uint32_t from = mSource->format;
    destroySource();
    if (status < 0) {
        EglLog(VF_LOG_ERROR, "%s: Conversion failed.",
               "int AsyncImageConverter::ConvertJob::doConversion()");
        VCImage_deallocate(&mOutput);
        return status;
    }
    EglLog(VF_LOG_DEBUG, "[Async] Time to convert %4.4s --> %4.4s: %d us", fourcc(from),
           fourcc(mFormat), probe());
    mListener->onFrameProcessed(mOutput, mTimestamp);
    VCImage_deallocate(&mOutput);
    return VC_OK;
}
