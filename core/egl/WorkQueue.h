// A queue of units of work run by a bounded pool of platform threads that are
// created on demand. The frame converters use it to convert frames, or bands
// of one frame, off the caller's thread.
#ifndef CORE_EGL_WORKQUEUE_H
#define CORE_EGL_WORKQUEUE_H

#include <utils/Condition.h>
#include <utils/Errors.h>
#include <utils/Mutex.h>
#include <utils/Thread.h>
#include <utils/Vector.h>

namespace android {

class WorkQueue {
public:
    class WorkUnit {
    public:
        WorkUnit() {}
        virtual ~WorkUnit() {}
        // False cancels the whole queue.
        virtual bool run() = 0;
    };

    // Workers are only created by schedule(), never more than maxThreads.
    WorkQueue(size_t maxThreads, bool canCallJava = true);
    // cancel(), then finish() unless the queue was already finished: pending
    // units are deleted without running and every worker is joined.
    ~WorkQueue();

    // Takes ownership of workUnit when it returns OK. With a non-zero backlog
    // it blocks while maxThreads * backlog units are pending. INVALID_OPERATION
    // once the queue is cancelled or finished.
    status_t schedule(WorkUnit* workUnit, size_t backlog = 2);
    // Deletes the pending units; workers stop after their current one.
    status_t cancel();
    // Lets the workers drain the pending units, then joins them. Never from a
    // worker.
    status_t finish();

    WorkQueue(const WorkQueue&) = delete;
    WorkQueue& operator=(const WorkQueue&) = delete;

private:
    class WorkThread : public Thread {
    public:
        WorkThread(WorkQueue* workQueue, bool canCallJava);
        virtual ~WorkThread();

    private:
        virtual bool threadLoop();
        WorkQueue* const mWorkQueue;
    };

    status_t cancelLocked();
    bool threadLoop();

    const size_t mMaxThreads;
    const bool mCanCallJava;

    Mutex mLock;
    Condition mWorkChangedCondition;
    Condition mWorkDequeuedCondition;

    bool mCanceled;
    bool mFinished;
    size_t mIdleThreads;
    Vector<sp<WorkThread> > mWorkThreads;
    Vector<WorkUnit*> mWorkUnits;
};

}  // namespace android

#endif
