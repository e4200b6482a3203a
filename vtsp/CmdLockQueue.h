// Blocking first-in, first-out queue joining the link's threads.
//
// Exactly one consumer waits on a queue; a push and a close each wake one
// waiter. The owner pauses a queue with reset (pushes refused, consumer keeps
// waiting) and shuts it with destroy (consumer woken, every wait returns false).
// The queue has no capacity of its own: a producer that must not run ahead
// of its consumer without bound asks waitForRoom after pushing.
#ifndef QUELLBORN_VTSP_CMDLOCKQUEUE_H
#define QUELLBORN_VTSP_CMDLOCKQUEUE_H

#include <android/log.h>
#include <pthread.h>

#include <deque>

#include "ScopedPthreadLock.h"

namespace android {

template <typename T>
class CmdLockQueue {
public:
    enum State { QUEUE_CLOSED = 0, QUEUE_RUNNING = 1, QUEUE_STOPPED = 2 };

    CmdLockQueue() {
        pthread_condattr_t attr;
        pthread_condattr_init(&attr);
        // Waits never time out today, but a monotonic clock keeps any future
        // timed wait immune to wall-clock changes on the handset.
        pthread_condattr_setclock(&attr, CLOCK_MONOTONIC);
        pthread_cond_init(&mCond, &attr);
        pthread_cond_init(&mRoomCond, &attr);
        pthread_condattr_destroy(&attr);
        pthread_mutex_init(&mMutex, nullptr);
    }

    ~CmdLockQueue() {
        pthread_cond_destroy(&mCond);
        pthread_cond_destroy(&mRoomCond);
        pthread_mutex_destroy(&mMutex);
    }

    CmdLockQueue(const CmdLockQueue&) = delete;
    CmdLockQueue& operator=(const CmdLockQueue&) = delete;

    void start() {
        ScopedPthreadLock lock(mMutex);
        mState = QUEUE_RUNNING;
    }

    // False when the queue refused the element (it is not running).
    bool pushAndSignal(const T& elem) {
        {
            ScopedPthreadLock lock(mMutex);
            if (mState != QUEUE_RUNNING) {
                __android_log_print(ANDROID_LOG_ERROR, "VTSPManager", "%s: failed to push elem",
                                    "pushAndSignal");
                return false;
            }
            mQueue.push_back(elem);
            if (mQueue.size() > mHighest) mHighest = mQueue.size();
        }
        pthread_cond_signal(&mCond);
        return true;
    }

    // Takes the front element into `out`; false once the queue is closed.
    bool waitAndPop(T& out) {
        bool roomMade = false;
        {
            ScopedPthreadLock lock(mMutex);
            if (mState == QUEUE_CLOSED) return false;
            while (mQueue.empty()) {
                pthread_cond_wait(&mCond, &mMutex);
                if (mState == QUEUE_CLOSED) return false;
            }
            out = mQueue.front();
            mQueue.pop_front();
            roomMade = mRoomBelow != 0 && mQueue.size() < mRoomBelow;
            if (roomMade) mRoomBelow = 0;  // one wake-up per wait for room
        }
        if (roomMade) pthread_cond_signal(&mRoomCond);
        return true;
    }

    // Returns at once while fewer than `high` elements are queued. Otherwise
    // waits until the consumer has taken the queue below `low`, or until the
    // queue is reset or closed (which empties it), so that shutting the queue
    // also ends this wait. Nothing is refused: pushes are accepted meanwhile.
    void waitForRoom(size_t high, size_t low) {
        ScopedPthreadLock lock(mMutex);
        if (mQueue.size() < high) return;
        while (mState == QUEUE_RUNNING && mQueue.size() >= low) {
            mRoomBelow = low;
            pthread_cond_wait(&mRoomCond, &mMutex);
        }
        mRoomBelow = 0;
    }

    void reset() {
        {
            ScopedPthreadLock lock(mMutex);
            drain();
            mState = QUEUE_STOPPED;
        }
        pthread_cond_broadcast(&mRoomCond);
    }

    void destroy() {
        {
            ScopedPthreadLock lock(mMutex);
            drain();
            mState = QUEUE_CLOSED;
        }
        pthread_cond_signal(&mCond);
        pthread_cond_broadcast(&mRoomCond);
    }

    // Snapshot for diagnostics and tests.
    State state() {
        ScopedPthreadLock lock(mMutex);
        return static_cast<State>(mState);
    }
    size_t size() {
        ScopedPthreadLock lock(mMutex);
        return mQueue.size();
    }
    struct Depth {
        size_t current;
        size_t highest;  // the most elements it has held at once
    };
    Depth depth() {
        ScopedPthreadLock lock(mMutex);
        return Depth{mQueue.size(), mHighest};
    }
    // The most elements the queue has held at once.
    size_t peakSize() {
        ScopedPthreadLock lock(mMutex);
        return mHighest;
    }

private:
    // Releases the elements one by one from the front, under the lock.
    void drain() {
        while (!mQueue.empty()) mQueue.pop_front();
    }

    std::deque<T> mQueue;
    pthread_cond_t mCond;
    pthread_mutex_t mMutex;
    int mState = QUEUE_CLOSED;
    size_t mHighest = 0;
    pthread_cond_t mRoomCond;  // the producer's wait for room
    size_t mRoomBelow = 0;     // while the producer waits: the size that wakes it
};

}  // namespace android

#endif  // QUELLBORN_VTSP_CMDLOCKQUEUE_H
