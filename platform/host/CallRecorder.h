// The process-wide record behind the host stand-ins (internal to platform/host).
#ifndef QUELLBORN_HOST_CALLRECORDER_H
#define QUELLBORN_HOST_CALLRECORDER_H

#include <cstdio>
#include <condition_variable>
#include <functional>
#include <map>
#include <mutex>
#include <string>
#include <vector>

#include "HostFakes.h"

namespace hostfakes {

// Text forms of arguments, shared by every stand-in so traces read alike.
std::string argText(long long value);
std::string argText(const char* text);
std::string outText(long long value);
std::string codecText(const tagMVD_CODEC* codec);

// Records a call whose only effect is its result: the test's override, or
// `natural`.
int recordCall(const std::string& function, std::vector<std::string> args, int natural = 0);

// Runs `fn` on a new native thread (as the media engine's own threads are:
// unknown to any virtual machine), waits for it and returns its result.
int runOnEngineThread(const std::function<int()>& fn);

class CallRecorder {
public:
    static CallRecorder& instance();

    // The result a call of `function` returns: the override if a test set
    // one, else `natural`.
    int resultFor(const std::string& function, int natural);
    // Appends a call to the record (and the trace) and returns its result.
    int record(const std::string& function, std::vector<std::string> args, int result);

    void reset();
    std::vector<Call> calls();
    void setResult(const std::string& function, int result);
    void clearResult(const std::string& function);
    void holdCalls(const std::string& function);
    void releaseCalls();
    void setTrace(const char* target);
    void setRecording(bool keep);

    // Each fake registers how to forget its state on reset().
    void addResetHook(std::function<void()> hook);

    // Guards the fakes' own state; never held while recording.
    std::mutex& stateMutex() { return mStateMutex; }

private:
    CallRecorder();
    ~CallRecorder();
    void closeTraceLocked();

    std::mutex mMutex;
    std::mutex mStateMutex;
    std::vector<Call> mCalls;
    std::map<std::string, int> mResults;
    std::string mHeld;  // calls of this function wait for mReleased
    std::condition_variable mReleased;
    std::vector<std::function<void()>> mResetHooks;
    FILE* mTrace = nullptr;
    bool mOwnsTrace = false;
    bool mKeep = true;
    unsigned long mSeq = 0;
};

}  // namespace hostfakes

#endif  // QUELLBORN_HOST_CALLRECORDER_H
