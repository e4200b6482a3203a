#include "CallbackTracker.h"

int CallbackTracker::registering() {
    std::lock_guard<std::mutex> lock(mLock);
    return ++mLast;
}

void CallbackTracker::registered(int callback) {
    std::lock_guard<std::mutex> lock(mLock);
    if (mRetired.count(callback) == 0) mRegistered.insert(callback);
}

CallbackTracker::Change CallbackTracker::changeIssued() const {
    std::lock_guard<std::mutex> lock(mLock);
    return Change(mRegistered.begin(), mRegistered.end());
}

void CallbackTracker::changeReturned(const Change& change) {
    std::lock_guard<std::mutex> lock(mLock);
    for (int callback : change) {
        mRegistered.erase(callback);
        mRetired.insert(callback);
    }
}

void CallbackTracker::died(int callback) {
    std::lock_guard<std::mutex> lock(mLock);
    mRegistered.erase(callback);
    mRetired.insert(callback);
}

bool CallbackTracker::retired(int callback) const {
    std::lock_guard<std::mutex> lock(mLock);
    return mRetired.count(callback) != 0;
}

bool CallbackTracker::anyRegistered() const {
    std::lock_guard<std::mutex> lock(mLock);
    return !mRegistered.empty();
}
