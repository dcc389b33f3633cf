#include "core/egl/WorkQueue.h"

namespace android {

WorkQueue::WorkQueue(size_t maxThreads, bool canCallJava)
    // A pool without a thread would hold its units for ever.
    : mMaxThreads(maxThreads > 0 ? maxThreads : 1),
      mCanCallJava(canCallJava),
      mCanceled(false),
      mFinished(false),
      mIdleThreads(0) {}

WorkQueue::~WorkQueue() {
    if (cancel() == OK) finish();
    // Units are only left over when a unit stopped its worker after finish()
    // had begun and no other worker remained to take them.
    for (size_t i = 0; i < mWorkUnits.size(); i++) delete mWorkUnits.itemAt(i);
}

status_t WorkQueue::schedule(WorkUnit* workUnit, size_t backlog) {
    AutoMutex lock(mLock);
    if (mFinished || mCanceled) return INVALID_OPERATION;

    if (mWorkThreads.size() < mMaxThreads && mIdleThreads < mWorkUnits.size() + 1) {
        sp<WorkThread> workThread = new WorkThread(this, mCanCallJava);
        status_t status = workThread->run("WorkQueue::WorkThread");
        if (status != OK) return status;
        mWorkThreads.add(workThread);
        mIdleThreads += 1;
    } else if (backlog) {
        while (mWorkUnits.size() >= mMaxThreads * backlog) {
            mWorkDequeuedCondition.wait(mLock);
            if (mFinished || mCanceled) return INVALID_OPERATION;
        }
    }

    mWorkUnits.add(workUnit);
    mWorkChangedCondition.broadcast();
    return OK;
}

status_t WorkQueue::cancel() {
    AutoMutex lock(mLock);
    return cancelLocked();
}

status_t WorkQueue::cancelLocked() {
    if (mFinished) return INVALID_OPERATION;
    if (!mCanceled) {
        mCanceled = true;
        for (size_t i = 0; i < mWorkUnits.size(); i++) delete mWorkUnits.itemAt(i);
        mWorkUnits.clear();
        mWorkChangedCondition.broadcast();
        mWorkDequeuedCondition.broadcast();
    }
    return OK;
}

status_t WorkQueue::finish() {
    {
        AutoMutex lock(mLock);
        if (mFinished) return INVALID_OPERATION;
        mFinished = true;
        mWorkChangedCondition.broadcast();
    }
    // Only the caller of finish() touches the thread list once mFinished is
    // set: schedule() refuses from then on.
    for (size_t i = 0; i < mWorkThreads.size(); i++) mWorkThreads.itemAt(i)->join();
    mWorkThreads.clear();
    return OK;
}

bool WorkQueue::threadLoop() {
    WorkUnit* workUnit;
    {
        AutoMutex lock(mLock);
        for (;;) {
            if (mCanceled) return false;
            if (!mWorkUnits.isEmpty()) {
                workUnit = mWorkUnits.itemAt(0);
                mWorkUnits.removeAt(0);
                mIdleThreads -= 1;
                mWorkDequeuedCondition.broadcast();
                break;
            }
            if (mFinished) return false;
            mWorkChangedCondition.wait(mLock);
        }
    }

    bool shouldContinue = workUnit->run();
    delete workUnit;

    AutoMutex lock(mLock);
    mIdleThreads += 1;
    if (!shouldContinue) {
        cancelLocked();
        return false;
    }
    return true;
}

WorkQueue::WorkThread::WorkThread(WorkQueue* workQueue, bool canCallJava)
    : Thread(canCallJava), mWorkQueue(workQueue) {}

WorkQueue::WorkThread::~WorkThread() {}

bool WorkQueue::WorkThread::threadLoop() {
    return mWorkQueue->threadLoop();
}

}  // namespace android
