#include "support/manual_clock.h"

#include <stdint.h>

#include <chrono>
#include <vector>

ManualClock::ManualClock(nsecs_t bootStart, int64_t uptimeStart)
    : mBootStart(bootStart), mUptimeStart(uptimeStart) {
    EglClock::install(this);
}

ManualClock::~ManualClock() {
    EglClock::install(nullptr);
}

nsecs_t ManualClock::bootTime() {
    std::lock_guard<std::mutex> guard(mLock);
    return mBootStart + mNow;
}

int64_t ManualClock::uptimeMillis() {
    std::lock_guard<std::mutex> guard(mLock);
    return mUptimeStart + mNow / 1000000;
}

void ManualClock::advance(nsecs_t ns) {
    std::vector<Waiter*> due;
    {
        std::lock_guard<std::mutex> guard(mLock);
        mNow += ns;
        for (Waiter* w : mWaiters) {
            if (w->deadline <= mNow) {
                ++w->waking;
                due.push_back(w);
            }
        }
    }
    // Each waiter's own mutex is taken (never under mLock, which waiters take
    // while holding theirs), so the signal cannot fall between its
    // registration and its wait; `waking` keeps it alive until then.
    for (Waiter* w : due) {
        w->mutex->lock();
        w->condition->broadcast();
        w->mutex->unlock();
        std::lock_guard<std::mutex> guard(mLock);
        --w->waking;
        mChanged.notify_all();
    }
}

bool ManualClock::waitForWaiters(size_t count) {
    std::unique_lock<std::mutex> lock(mLock);
    return mChanged.wait_for(lock, std::chrono::seconds(20),
                             [&] { return mWaiters.size() >= count; });
}

size_t ManualClock::waitsBegun() {
    std::lock_guard<std::mutex> guard(mLock);
    return mWaitsBegun;
}

bool ManualClock::waitForWaitsBegun(size_t count) {
    std::unique_lock<std::mutex> lock(mLock);
    return mChanged.wait_for(lock, std::chrono::seconds(20), [&] { return mWaitsBegun >= count; });
}

size_t ManualClock::waiters() {
    std::lock_guard<std::mutex> guard(mLock);
    return mWaiters.size();
}

android::status_t ManualClock::wait(android::Condition& condition, android::Mutex& mutex) {
    return block(condition, mutex, INT64_MAX);
}

android::status_t ManualClock::waitRelative(android::Condition& condition, android::Mutex& mutex,
                                            nsecs_t reltime) {
    nsecs_t deadline;
    {
        std::lock_guard<std::mutex> guard(mLock);
        if (reltime <= 0) return android::TIMED_OUT;
        deadline = mNow + reltime;
    }
    return block(condition, mutex, deadline);
}

android::status_t ManualClock::block(android::Condition& condition, android::Mutex& mutex,
                                     nsecs_t deadline) {
    Waiter self = {&condition, &mutex, deadline};
    {
        std::lock_guard<std::mutex> guard(mLock);
        mWaiters.push_back(&self);
        ++mWaitsBegun;
        mChanged.notify_all();
    }
    condition.wait(mutex);
    std::unique_lock<std::mutex> lock(mLock);
    mWaiters.remove(&self);
    mChanged.notify_all();
    const bool expired = mNow >= deadline;
    if (self.waking > 0) {
        // An advance() is about to take `mutex` to signal us: let it.
        mutex.unlock();
        mChanged.wait(lock, [&] { return self.waking == 0; });
        lock.unlock();
        mutex.lock();
    }
    return expired ? android::TIMED_OUT : android::NO_ERROR;
}
