// Calls in progress to an event observer. The media engine's and the video
// library's event threads load the observer and call it with no lock held,
// so taking an observer away must also wait for the calls that loaded it
// already: the observer may be deleted right after.
#ifndef QUELLBORN_MME_JNI_OBSERVERCALLS_H
#define QUELLBORN_MME_JNI_OBSERVERCALLS_H

#include <atomic>
#include <condition_variable>
#include <mutex>

namespace android {

class ObserverCalls {
public:
    // One call: counted from before the observer is loaded until it returns.
    class Call {
    public:
        explicit Call(ObserverCalls& calls) : mCalls(calls) {
            std::lock_guard<std::mutex> lock(mCalls.mLock);
            ++mCalls.mInProgress;
        }
        ~Call() {
            {
                std::lock_guard<std::mutex> lock(mCalls.mLock);
                --mCalls.mInProgress;
            }
            mCalls.mIdle.notify_all();
        }
        Call(const Call&) = delete;
        Call& operator=(const Call&) = delete;

    private:
        ObserverCalls& mCalls;
    };

    // Clears `slot` if it still holds `observer`, then waits until no call
    // started before that is still running. Never called from inside a call.
    template <typename Observer>
    void unregister(std::atomic<Observer*>& slot, Observer* observer) {
        slot.compare_exchange_strong(observer, nullptr);
        std::unique_lock<std::mutex> lock(mLock);
        mIdle.wait(lock, [this] { return mInProgress == 0; });
    }

private:
    std::mutex mLock;
    std::condition_variable mIdle;
    int mInProgress = 0;
};

}  // namespace android

#endif  // QUELLBORN_MME_JNI_OBSERVERCALLS_H
