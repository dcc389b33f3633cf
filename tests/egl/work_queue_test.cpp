// kiv-test-labels: threads
#include "core/egl/WorkQueue.h"

#include <gtest/gtest.h>
#include <pthread.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <condition_variable>
#include <map>
#include <mutex>
#include <set>
#include <thread>
#include <vector>

using android::WorkQueue;

namespace {

const int kInvalidOperation = -38;

// Runs and deletions of every unit of a test, and the threads that ran them.
struct Tracker {
    std::mutex lock;
    std::condition_variable changed;
    std::vector<int> runs;
    std::map<int, int> deleted;
    std::set<pthread_t> threads;
    void note(int id, bool ran) {
        std::lock_guard<std::mutex> g(lock);
        if (ran)
            runs.push_back(id), threads.insert(pthread_self());
        else
            deleted[id]++;
        changed.notify_all();
    }
    // Bounded, so that a broken queue fails instead of hanging.
    bool waitUntil(size_t ran, size_t gone) {
        std::unique_lock<std::mutex> g(lock);
        return changed.wait_for(g, std::chrono::seconds(20), [&] {
            size_t n = 0;
            for (const auto& d : deleted) n += d.second;
            return runs.size() >= ran && n >= gone;
        });
    }
    std::vector<int> sortedRuns() {
        std::lock_guard<std::mutex> g(lock);
        std::vector<int> r = runs;
        std::sort(r.begin(), r.end());
        return r;
    }
};

struct Gate {
    std::mutex lock;
    std::condition_variable changed;
    bool isOpen = false;
    void open() {
        std::lock_guard<std::mutex> g(lock);
        isOpen = true;
        changed.notify_all();
    }
    void pass() {
        std::unique_lock<std::mutex> g(lock);
        changed.wait(g, [&] { return isOpen; });
    }
};

// Notes its run and deletion; may wait at a gate, and may open one when deleted.
struct Unit : WorkQueue::WorkUnit {
    Unit(Tracker& t, int id, Gate* wait = nullptr, bool result = true, Gate* openOnDelete = nullptr)
        : t(t), id(id), wait(wait), result(result), openOnDelete(openOnDelete) {}
    ~Unit() override {
        t.note(id, false);
        if (openOnDelete != nullptr) openOnDelete->open();
    }
    bool run() override {
        t.note(id, true);
        if (wait != nullptr) wait->pass();
        return result;
    }
    Tracker& t;
    int id;
    Gate* wait;
    bool result;
    Gate* openOnDelete;
};

std::vector<int> ids(int n) {
    std::vector<int> v(n);
    for (int i = 0; i < n; ++i) v[i] = i;
    return v;
}

TEST(WorkQueue, OneThreadNoBacklogQueuesAllAndRunsInOrder) {
    Tracker t;
    Gate gate;
    WorkQueue queue(1, false);
    // The first unit holds the only worker: the others queue without blocking.
    for (int i = 0; i < 3; ++i) ASSERT_EQ(0, queue.schedule(new Unit(t, i, i ? 0 : &gate), 0));
    gate.open();
    ASSERT_EQ(0, queue.finish());
    EXPECT_EQ(ids(3), t.runs);
    EXPECT_EQ(1u, t.threads.size());
    EXPECT_EQ((std::map<int, int>{{0, 1}, {1, 1}, {2, 1}}), t.deleted);
}

TEST(WorkQueue, FullBacklogBlocksTheProducerUntilAUnitIsTaken) {
    Tracker t;
    Gate first, second;
    WorkQueue queue(2, true);
    // Two busy workers, then two pending units fill a backlog of 2 x 1.
    ASSERT_EQ(0, queue.schedule(new Unit(t, 0, &first), 1));
    ASSERT_TRUE(t.waitUntil(1, 0));
    ASSERT_EQ(0, queue.schedule(new Unit(t, 1, &second), 1));
    ASSERT_TRUE(t.waitUntil(2, 0));
    for (int i = 2; i < 4; ++i) ASSERT_EQ(0, queue.schedule(new Unit(t, i), 1));
    std::atomic<bool> scheduling{false}, opened{false};
    std::thread opener([&] {
        while (!scheduling.load()) std::this_thread::yield();
        opened.store(true);
        first.open();
    });
    scheduling.store(true);
    ASSERT_EQ(0, queue.schedule(new Unit(t, 4), 1));
    EXPECT_TRUE(opened.load());  // only a finished unit 0 could free a place
    opener.join();
    second.open();
    ASSERT_EQ(0, queue.finish());
    EXPECT_EQ(ids(5), t.sortedRuns());
    EXPECT_EQ(2u, t.threads.size());
}

TEST(WorkQueue, UnitReturningFalseCancelsAndDropsPendingUnits) {
    Tracker t;
    Gate gate;
    WorkQueue queue(1, false);
    ASSERT_EQ(0, queue.schedule(new Unit(t, 0, &gate, false), 0));
    for (int i = 1; i < 3; ++i) ASSERT_EQ(0, queue.schedule(new Unit(t, i), 0));
    gate.open();
    ASSERT_TRUE(t.waitUntil(1, 3));
    Unit late(t, 3);  // a refused unit stays the caller's
    EXPECT_EQ(kInvalidOperation, queue.schedule(&late, 0));
    EXPECT_EQ(0, queue.finish());
    EXPECT_EQ(std::vector<int>{0}, t.runs);
    EXPECT_EQ((std::map<int, int>{{0, 1}, {1, 1}, {2, 1}}), t.deleted);
}

TEST(WorkQueue, StatusesAfterCancelAndFinish) {
    EXPECT_EQ(kInvalidOperation, android::INVALID_OPERATION);
    const int X = kInvalidOperation;
    // 's'chedule, 'c'ancel, 'f'inish, each with its expected status.
    const std::vector<std::vector<std::pair<char, int>>> scripts = {
        {{'f', 0}, {'f', X}, {'c', X}, {'s', X}},
        {{'s', 0}, {'c', 0}, {'c', 0}, {'s', X}, {'f', 0}, {'f', X}},
        {{'s', 0}, {'f', 0}, {'s', X}, {'c', X}},
    };
    for (size_t i = 0; i < scripts.size(); ++i) {
        Tracker t;
        WorkQueue queue(2, false);
        for (const auto& step : scripts[i]) {
            Unit* unit = new Unit(t, 0);
            int status = step.first == 's'   ? queue.schedule(unit, 2)
                         : step.first == 'c' ? queue.cancel()
                                             : queue.finish();
            if (step.first != 's' || status != 0) delete unit;
            EXPECT_EQ(step.second, status) << "script " << i << " step " << step.first;
        }
    }
}

TEST(WorkQueue, DestroyingDeletesPendingUnitsUnrunAndJoins) {
    Tracker t;
    Gate gate;
    {
        WorkQueue queue(1, true);
        ASSERT_EQ(0, queue.schedule(new Unit(t, 0, &gate), 0));
        ASSERT_TRUE(t.waitUntil(1, 0));
        // Deleting a pending unit releases the running one, so the join ends.
        ASSERT_EQ(0, queue.schedule(new Unit(t, 1, nullptr, true, &gate), 0));
        ASSERT_EQ(0, queue.schedule(new Unit(t, 2), 0));
    }
    EXPECT_EQ(std::vector<int>{0}, t.runs);
    EXPECT_EQ((std::map<int, int>{{0, 1}, {1, 1}, {2, 1}}), t.deleted);
}

TEST(WorkQueue, StopDuringFinishLeavesNothingBehind) {
    Tracker t;
    Gate gate;
    {
        WorkQueue queue(1, false);
        ASSERT_EQ(0, queue.schedule(new Unit(t, 0, &gate, false), 0));
        ASSERT_EQ(0, queue.schedule(new Unit(t, 1), 0));
        std::thread opener([&] { gate.open(); });
        EXPECT_EQ(0, queue.finish());
        opener.join();
    }
    // Unit 1 was dropped by the stop or by the destructor: either way once.
    EXPECT_EQ((std::map<int, int>{{0, 1}, {1, 1}}), t.deleted);
}

// Producers race each other, the workers and (second pass) a cancel: every
// unit is accepted or refused; accepted ones are deleted exactly once and run
// at most once (exactly once without the cancel); none is accepted after the
// cancel returned; no more workers than allowed.
TEST(WorkQueue, ProducersWorkersAndCancelLoseNothing) {
    const int kProducers = 3, kEach = 300;
    for (bool cancel : {false, true}) {
        Tracker t;
        std::vector<int> accepted[kProducers];
        std::atomic<bool> cancelled{false};
        std::atomic<int> lateAccepts{0};
        const size_t threads = cancel ? 2 : 3;
        {
            WorkQueue queue(threads, true);
            std::vector<std::thread> producers;
            for (int p = 0; p < kProducers; ++p)
                producers.emplace_back([&, p] {
                    for (int i = 0; i < kEach; ++i) {
                        Unit* unit = new Unit(t, p * kEach + i);
                        const bool after = cancelled.load();
                        if (queue.schedule(unit, i % 3) == 0) {
                            accepted[p].push_back(p * kEach + i);
                            lateAccepts += after;
                        } else {
                            delete unit;
                        }
                    }
                });
            if (cancel) {
                ASSERT_TRUE(t.waitUntil(50, 0));
                EXPECT_EQ(0, queue.cancel());
                cancelled.store(true);
            }
            for (std::thread& p : producers) p.join();
            EXPECT_EQ(0, queue.finish());  // with work still pending when not cancelled
        }
        std::map<int, int> runs;
        for (int id : t.runs) runs[id]++;
        size_t total = 0;
        for (const auto& list : accepted) {
            total += list.size();
            for (int id : list) {
                EXPECT_EQ(1, t.deleted[id]) << id;
                EXPECT_LE(runs[id], 1) << id;
                EXPECT_TRUE(cancel || runs[id] == 1) << id;
            }
        }
        EXPECT_EQ(0, lateAccepts.load());
        EXPECT_EQ(static_cast<size_t>(kProducers * kEach), t.deleted.size());
        if (!cancel) {
            EXPECT_EQ(total, t.runs.size());
        }
        EXPECT_LE(t.threads.size(), threads);
    }
}

}  // namespace
