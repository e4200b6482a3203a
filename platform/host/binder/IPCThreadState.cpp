// The part of IPCThreadState a service uses to learn who called it: one
// state per thread, created on first use and freed when the thread ends. The
// calling identity is this process's own outside a transaction; BBinder's
// transact puts a client's identity in place for the transaction's length.
#include <binder/IPCThreadState.h>

#include <pthread.h>
#include <unistd.h>

#include "HostBinder.h"

namespace android {

namespace {

pthread_key_t gStateKey;
pthread_once_t gStateKeyOnce = PTHREAD_ONCE_INIT;

// Kept apart from IPCThreadState because only the BBinder side reads it.
struct ClientIdentity {
    bool set = false;
    pid_t pid = 0;
    uid_t uid = 0;
};
thread_local ClientIdentity tClient;

}  // namespace

// There is no driver to open and no process state is ever made; defining the
// destructor (the class's key function) gives ProcessState the type
// information that sp<ProcessState> in IPCThreadState refers to.
ProcessState::~ProcessState() {}

IPCThreadState* IPCThreadState::self() {
    pthread_once(&gStateKeyOnce, [] { pthread_key_create(&gStateKey, threadDestructor); });
    auto* state = static_cast<IPCThreadState*>(pthread_getspecific(gStateKey));
    if (state == nullptr) {
        state = new IPCThreadState();
        pthread_setspecific(gStateKey, state);
    }
    return state;
}

IPCThreadState* IPCThreadState::selfOrNull() {
    pthread_once(&gStateKeyOnce, [] { pthread_key_create(&gStateKey, threadDestructor); });
    return static_cast<IPCThreadState*>(pthread_getspecific(gStateKey));
}

IPCThreadState::IPCThreadState()
        : mProcess(nullptr),
          mLastError(NO_ERROR),
          mServingStackPointer(nullptr),
          mCallingPid(0),
          mCallingSid(nullptr),
          mCallingUid(0),
          mWorkSource(kUnsetWorkSource),
          mPropagateWorkSource(false),
          mStrictModePolicy(0),
          mLastTransactionBinderFlags(0),
          mCallRestriction(ProcessState::CallRestriction::NONE) {
    clearCaller();
}

IPCThreadState::~IPCThreadState() {}

void IPCThreadState::threadDestructor(void* state) { delete static_cast<IPCThreadState*>(state); }

void IPCThreadState::clearCaller() {
    mCallingPid = getpid();
    mCallingSid = nullptr;
    mCallingUid = getuid();
}

pid_t IPCThreadState::getCallingPid() const { return mCallingPid; }

const char* IPCThreadState::getCallingSid() const { return mCallingSid; }

uid_t IPCThreadState::getCallingUid() const { return mCallingUid; }

int64_t IPCThreadState::clearCallingIdentity() {
    // libbinder's token: the uid in the high word, the pid in the low one.
    const int64_t token = static_cast<int64_t>((static_cast<uint64_t>(mCallingUid) << 32) |
                                               static_cast<uint32_t>(mCallingPid));
    clearCaller();
    return token;
}

void IPCThreadState::restoreCallingIdentity(int64_t token) {
    mCallingUid = static_cast<uid_t>(static_cast<uint64_t>(token) >> 32);
    mCallingSid = nullptr;
    mCallingPid = static_cast<pid_t>(static_cast<int32_t>(token & 0xffffffff));
}

}  // namespace android

namespace hostbinder {

void setClientIdentity(pid_t pid, uid_t uid) { android::tClient = {true, pid, uid}; }

void clearClientIdentity() { android::tClient = {}; }

bool clientIdentity(pid_t* pid, uid_t* uid) {
    if (!android::tClient.set) return false;
    *pid = android::tClient.pid;
    *uid = android::tClient.uid;
    return true;
}

}  // namespace hostbinder
