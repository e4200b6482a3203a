// Holds a pthread mutex for a scope. The link's queues and the engine's
// callback lock are plain pthread mutexes (they wait on pthread condition
// variables on the monotonic clock), so std::lock_guard's BasicLockable
// wrapper would only add a layer.
#ifndef QUELLBORN_VTSP_SCOPEDPTHREADLOCK_H
#define QUELLBORN_VTSP_SCOPEDPTHREADLOCK_H

#include <pthread.h>

namespace android {

class ScopedPthreadLock {
public:
    explicit ScopedPthreadLock(pthread_mutex_t& mutex) : mMutex(mutex) {
        pthread_mutex_lock(&mMutex);
    }
    ~ScopedPthreadLock() { pthread_mutex_unlock(&mMutex); }
    ScopedPthreadLock(const ScopedPthreadLock&) = delete;
    ScopedPthreadLock& operator=(const ScopedPthreadLock&) = delete;

private:
    pthread_mutex_t& mMutex;
};

}  // namespace android

#endif  // QUELLBORN_VTSP_SCOPEDPTHREADLOCK_H
