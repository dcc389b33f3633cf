// Frame converters: on the caller's thread (SyncImageConverter) or on a
// worker thread (AsyncImageConverter), which tries the external converter,
// then a conversion cut into bands run in parallel, then a plain one.
#ifndef CORE_EGL_ASYNCIMAGECONVERTER_H
#define CORE_EGL_ASYNCIMAGECONVERTER_H

#include <utils/Mutex.h>

#include "core/egl/ImageConverter.h"
#include "core/egl/WorkQueue.h"

// Converts on the caller's thread into one reused output image, always (a
// frame already in the preferred format is copied). Calls are serialised.
class SyncImageConverter : public ImageConverter {
public:
    SyncImageConverter();
    virtual int convertAndPost(VCImage* image, OnFrameListener& listener, nsecs_t timestamp,
                               bool takeOwnership);

protected:
    virtual ~SyncImageConverter();

private:
    android::Mutex mLock;
    VCImage mOutput;
};

// Frames are converted and posted on the queue's workers in submission
// order; with one thread the listener is always called from that thread.
class AsyncImageConverter : public ImageConverter {
public:
    explicit AsyncImageConverter(int threads);
    virtual int convertAndPost(VCImage* image, OnFrameListener& listener, nsecs_t timestamp,
                               bool takeOwnership);

    class ConvertJob : public android::WorkQueue::WorkUnit {
    public:
        // Keeps image when takeOwnership, else a clone made here, on the
        // caller's thread.
        ConvertJob(VCImage* image, OnFrameListener& listener, nsecs_t timestamp,
                   bool takeOwnership);
        virtual ~ConvertJob();
        // Always true: a failed frame never stops the queue.
        virtual bool run();

        // Bands a frame of this height is cut into; 0 when it is not cut.
        static int sliceCount(int height);
        // Rows a band of bandRows converted from one format to the other is
        // taken in at a time, so that threads that finish early can share
        // what is left of the others.
        static int chunkRows(int bandRows, int width, uint32_t from, uint32_t to);
        bool hasSource() const { return mSource != nullptr; }

    private:
        bool doConversionExternal();
        bool doConversionSlicesCPU();
        int doConversion();
        // Sets the output's geometry; false when the format has no size.
        bool prepareOutput();
        void destroySource();

        VCImage* mSource;
        OnFrameListener* mListener;
        nsecs_t mTimestamp;
        VCImage mOutput;
        uint32_t mFormat;
    };

protected:
    // Returns once every frame already accepted has been posted.
    virtual ~AsyncImageConverter();

    android::WorkQueue mWorkQueue;
};

#endif
