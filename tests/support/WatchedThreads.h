// Threads a test starts to drive a load or a fault. Joining waits at most
// the watchdog: a thread still running then is deadlocked, which is reported
// and ends the process rather than hang the suite.
#ifndef QUELLBORN_TESTS_WATCHEDTHREADS_H
#define QUELLBORN_TESTS_WATCHEDTHREADS_H

#include <atomic>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <future>
#include <thread>
#include <vector>

#include "Eventually.h"

class WatchedThreads {
public:
    explicit WatchedThreads(std::chrono::milliseconds watchdog) : mWatchdog(watchdog) {}
    ~WatchedThreads() { join(); }
    WatchedThreads(const WatchedThreads&) = delete;
    WatchedThreads& operator=(const WatchedThreads&) = delete;

    // Runs `body` on a thread of its own; the future holds what it returned.
    template <typename Body>
    std::future<decltype(std::declval<Body>()())> run(Body body) {
        std::packaged_task<decltype(body())()> task(std::move(body));
        auto result = task.get_future();
        mThreads.emplace_back([this, task = std::move(task)]() mutable {
            task();
            ++mFinished;
        });
        return result;
    }

    // True once `f`'s thread has delivered, false if the watchdog ran out first.
    template <typename T>
    bool finishes(std::future<T>& f) const {
        return f.wait_for(mWatchdog) == std::future_status::ready;
    }

    void join() {
        if (!eventually([&] { return mFinished == mThreads.size(); }, mWatchdog)) {
            fprintf(stderr, "deadlock: %zu of %zu threads still running\n", mThreads.size() - mFinished,
                    mThreads.size());
            std::abort();
        }
        for (std::thread& t : mThreads) t.join();
        mThreads.clear();
        mFinished = 0;
    }

private:
    const std::chrono::milliseconds mWatchdog;
    std::vector<std::thread> mThreads;
    std::atomic<size_t> mFinished{0};
};

#endif  // QUELLBORN_TESTS_WATCHEDTHREADS_H
