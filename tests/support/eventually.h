// Waiting on threads the test does not drive (a virtual camera's, an
// encoder's): true once `done` holds, false after 20 s of real time. Only for
// conditions that follow from work, never from the passing of time.
#ifndef KIV_TESTS_SUPPORT_EVENTUALLY_H
#define KIV_TESTS_SUPPORT_EVENTUALLY_H

#include <chrono>
#include <functional>
#include <thread>

inline bool eventually(const std::function<bool()>& done) {
    const auto end = std::chrono::steady_clock::now() + std::chrono::seconds(20);
    while (!done()) {
        if (std::chrono::steady_clock::now() > end) return false;
        std::this_thread::yield();
    }
    return true;
}

#endif
