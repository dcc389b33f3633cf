// A clock the test moves by hand, installed in place of the system's for its
// lifetime, so that timing rules run step by step: time stands still until
// advance(); timed waits end when advance() reaches their deadline (or when
// their condition is signalled); waitForWaiters() tells when other threads
// are blocked in a wait of the clock, so a test knows they reached it
// without sleeping.
#ifndef KIV_TESTS_SUPPORT_MANUAL_CLOCK_H
#define KIV_TESTS_SUPPORT_MANUAL_CLOCK_H

#include <condition_variable>
#include <list>
#include <mutex>

#include "core/egl/EglClock.h"

class ManualClock : public EglClock {
public:
    // Boot time starts at `bootStart` ns and uptime at `uptimeStart` ms; both
    // move together.
    explicit ManualClock(nsecs_t bootStart = 1000000000000LL, int64_t uptimeStart = 500000);
    ~ManualClock() override;

    void advance(nsecs_t ns);
    void advanceMs(int64_t ms) { advance(ms * 1000000); }
    // Until at least `count` threads wait on this clock; false after
    // 20 s of real time (the test is broken, not slow).
    bool waitForWaiters(size_t count);
    size_t waiters();
    // Waits begun on this clock since it was made, and a wait (20 s of real
    // time at most) until they reach `count`: how a test tells that a thread
    // has gone round its loop once more.
    size_t waitsBegun();
    bool waitForWaitsBegun(size_t count);

    nsecs_t bootTime() override;
    int64_t uptimeMillis() override;
    android::status_t wait(android::Condition& condition, android::Mutex& mutex) override;
    android::status_t waitRelative(android::Condition& condition, android::Mutex& mutex,
                                   nsecs_t reltime) override;

    ManualClock(const ManualClock&) = delete;
    ManualClock& operator=(const ManualClock&) = delete;

private:
    struct Waiter {
        android::Condition* condition;
        android::Mutex* mutex;
        nsecs_t deadline;  // on the clock's own scale; INT64_MAX for none
        int waking = 0;    // advance() calls about to signal it
    };
    android::status_t block(android::Condition& condition, android::Mutex& mutex, nsecs_t deadline);

    std::mutex mLock;
    std::condition_variable mChanged;
    std::list<Waiter*> mWaiters;
    nsecs_t mNow = 0;
    size_t mWaitsBegun = 0;
    const nsecs_t mBootStart;
    const int64_t mUptimeStart;
};

#endif
