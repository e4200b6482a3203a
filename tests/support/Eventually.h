// Waits for an effect that another thread brings about: polls `pred` until it
// holds or `timeout` passes. Tests assert on the outcome, never on the time.
#ifndef QUELLBORN_TESTS_EVENTUALLY_H
#define QUELLBORN_TESTS_EVENTUALLY_H

#include <chrono>
#include <thread>

template <typename Pred>
bool eventually(Pred pred, std::chrono::milliseconds timeout = std::chrono::seconds(5)) {
    const auto deadline = std::chrono::steady_clock::now() + timeout;
    while (!pred()) {
        if (std::chrono::steady_clock::now() >= deadline) return false;
        std::this_thread::sleep_for(std::chrono::milliseconds(2));
    }
    return true;
}

// Milliseconds since `start`: for the few checks that a call is woken rather
// than left to wait out a pause.
inline long long msSince(std::chrono::steady_clock::time_point start) {
    return std::chrono::duration_cast<std::chrono::milliseconds>(std::chrono::steady_clock::now() - start)
            .count();
}

#endif  // QUELLBORN_TESTS_EVENTUALLY_H
