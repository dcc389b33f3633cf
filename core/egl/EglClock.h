// The clocks and timed waits of the live pipeline's timing rules (frame
// pacing, late-frame counting, catch-up, recording intervals), in one place
// so that a test can put a clock of its own in their stead and drive those
// rules step by step instead of sleeping. Unless a clock is installed, the
// system's clocks and condition waits are used unchanged.
#ifndef CORE_EGL_EGLCLOCK_H
#define CORE_EGL_EGLCLOCK_H

#include <stdint.h>

#include <atomic>

#include <utils/Condition.h>
#include <utils/Errors.h>
#include <utils/Mutex.h>
#include <utils/SystemClock.h>
#include <utils/Timers.h>

class EglClock {
public:
    virtual ~EglClock() = default;

    // The clock in use.
    static EglClock& get();
    // Puts `clock` in use (null: the system's again). Install before the
    // threads that read the clock start, and remove after they stopped.
    static void install(EglClock* clock);

    // systemTime(SYSTEM_TIME_BOOTTIME), in nanoseconds.
    virtual nsecs_t bootTime() = 0;
    // uptimeMillis().
    virtual int64_t uptimeMillis() = 0;
    // Condition waits, `mutex` held by the caller: woken by a signal (or
    // spuriously: callers test their predicate again), or, for the timed
    // form, when `reltime` has passed on this clock (TIMED_OUT).
    virtual android::status_t wait(android::Condition& condition, android::Mutex& mutex) = 0;
    virtual android::status_t waitRelative(android::Condition& condition, android::Mutex& mutex,
                                           nsecs_t reltime) = 0;

private:
    class System;
    static EglClock* system();
    static std::atomic<EglClock*>& current();
};

// Header only, so that the host layer (whose queues wait on it) needs no
// link to the core.
class EglClock::System : public EglClock {
public:
    nsecs_t bootTime() override { return systemTime(SYSTEM_TIME_BOOTTIME); }
    int64_t uptimeMillis() override { return android::uptimeMillis(); }
    android::status_t wait(android::Condition& condition, android::Mutex& mutex) override {
        return condition.wait(mutex);
    }
    android::status_t waitRelative(android::Condition& condition, android::Mutex& mutex,
                                   nsecs_t reltime) override {
        return condition.waitRelative(mutex, reltime);
    }
};

inline EglClock* EglClock::system() {
    static System clock;
    return &clock;
}

inline std::atomic<EglClock*>& EglClock::current() {
    static std::atomic<EglClock*> clock{system()};
    return clock;
}

inline EglClock& EglClock::get() {
    return *current().load(std::memory_order_acquire);
}

inline void EglClock::install(EglClock* clock) {
    current().store(clock != nullptr ? clock : system(), std::memory_order_release);
}

#endif
