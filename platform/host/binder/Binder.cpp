// The local side of libbinder for a host process: IBinder's defaults, BBinder,
// BpRefBase and IInterface, with the behaviour a device's libbinder has toward
// code in the same process.
#include <binder/Binder.h>
#include <binder/IInterface.h>
#include <binder/IPCThreadState.h>
#include <binder/Parcel.h>
#include <utils/Vector.h>

#include <unistd.h>

#include <map>
#include <mutex>

#include "HostBinder.h"

namespace android {

// ---------------------------------------------------------------------------
// IBinder

IBinder::IBinder() : RefBase() {}

IBinder::~IBinder() {}

sp<IInterface> IBinder::queryLocalInterface(const String16& /*descriptor*/) { return nullptr; }

bool IBinder::checkSubclass(const void* /*subclassID*/) const { return false; }

BBinder* IBinder::localBinder() { return nullptr; }

BpBinder* IBinder::remoteBinder() { return nullptr; }

status_t IBinder::getExtension(sp<IBinder>* out) {
    if (BBinder* local = localBinder()) {
        *out = local->getExtension();
        return NO_ERROR;
    }
    Parcel data;
    Parcel reply;
    status_t err = transact(EXTENSION_TRANSACTION, data, &reply);
    if (err != NO_ERROR) return err;
    return reply.readNullableStrongBinder(out);
}

status_t IBinder::getDebugPid(pid_t* outPid) {
    if (BBinder* local = localBinder()) {
        *outPid = local->getDebugPid();
        return NO_ERROR;
    }
    Parcel data;
    Parcel reply;
    status_t err = transact(DEBUG_PID_TRANSACTION, data, &reply);
    if (err != NO_ERROR) return err;
    int32_t pid = 0;
    err = reply.readInt32(&pid);
    if (err == NO_ERROR) *outPid = pid;
    return err;
}

// ---------------------------------------------------------------------------
// BBinder

namespace {

// Puts the identity of the thread's client (hostbinder::setClientIdentity)
// in the thread's calling identity for one transaction.
class CallingIdentityScope {
public:
    CallingIdentityScope() {
        pid_t pid = 0;
        uid_t uid = 0;
        mActive = hostbinder::clientIdentity(&pid, &uid);
        if (!mActive) return;
        IPCThreadState* ipc = IPCThreadState::self();
        mSaved = ipc->clearCallingIdentity();
        ipc->restoreCallingIdentity(static_cast<int64_t>((static_cast<uint64_t>(uid) << 32) |
                                                         static_cast<uint32_t>(pid)));
    }
    ~CallingIdentityScope() {
        if (mActive) IPCThreadState::self()->restoreCallingIdentity(mSaved);
    }
    CallingIdentityScope(const CallingIdentityScope&) = delete;
    CallingIdentityScope& operator=(const CallingIdentityScope&) = delete;

private:
    bool mActive = false;
    int64_t mSaved = 0;
};

}  // namespace

class BBinder::Extras {
public:
    struct Attached {
        void* object;
        void* cleanupCookie;
        IBinder::object_cleanup_func func;
    };

    ~Extras() {
        for (const auto& [id, entry] : mObjects) {
            if (entry.func != nullptr) entry.func(id, entry.object, entry.cleanupCookie);
        }
    }

    std::mutex mLock;
    std::map<const void*, Attached> mObjects;
    sp<IBinder> mExtension;
    bool mRequestingSid = false;
};

BBinder::BBinder() : mExtras(nullptr), mReserved0(nullptr) {}

BBinder::~BBinder() { delete mExtras.load(std::memory_order_acquire); }

BBinder::Extras* BBinder::getOrCreateExtras() {
    Extras* extras = mExtras.load(std::memory_order_acquire);
    if (extras != nullptr) return extras;
    auto* fresh = new Extras();
    if (mExtras.compare_exchange_strong(extras, fresh, std::memory_order_acq_rel)) return fresh;
    delete fresh;  // another thread won; `extras` now holds its object
    return extras;
}

const String16& BBinder::getInterfaceDescriptor() const {
    // A binder without an interface of its own answers an empty name.
    static const String16 empty;
    return empty;
}

bool BBinder::isBinderAlive() const { return true; }

status_t BBinder::pingBinder() { return NO_ERROR; }

status_t BBinder::dump(int /*fd*/, const Vector<String16>& /*args*/) { return NO_ERROR; }

status_t BBinder::transact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags) {
    // In one process the caller's own parcel arrives: read it from the start.
    data.setDataPosition(0);
    // A thread that plays a client process calls with that process's
    // identity, as the driver reports the sender; ours comes back after.
    CallingIdentityScope caller;
    status_t err = NO_ERROR;
    switch (code) {
        case PING_TRANSACTION:
            err = pingBinder();
            break;
        case EXTENSION_TRANSACTION:
            err = reply != nullptr ? reply->writeStrongBinder(getExtension()) : BAD_VALUE;
            break;
        case DEBUG_PID_TRANSACTION:
            err = reply != nullptr ? reply->writeInt32(getDebugPid()) : BAD_VALUE;
            break;
        default:
            err = onTransact(code, data, reply, flags);
            break;
    }
    // ... and the caller reads the reply from the start.
    if (reply != nullptr) reply->setDataPosition(0);
    return err;
}

status_t BBinder::onTransact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t /*flags*/) {
    switch (code) {
        case DUMP_TRANSACTION: {
            // The descriptor stays the parcel's: dump writes to it and leaves it open.
            const int fd = data.readFileDescriptor();
            const int32_t argc = data.readInt32();
            Vector<String16> args;
            for (int32_t i = 0; i < argc && data.dataAvail() > 0; ++i) args.add(data.readString16());
            return dump(fd, args);
        }
        case INTERFACE_TRANSACTION:
            if (reply != nullptr) reply->writeString16(getInterfaceDescriptor());
            return NO_ERROR;
        case SYSPROPS_TRANSACTION:
            return NO_ERROR;
        default:
            return UNKNOWN_TRANSACTION;
    }
}

// A local binder cannot die without its process, so there is nothing to link.
status_t BBinder::linkToDeath(const sp<DeathRecipient>& /*recipient*/, void* /*cookie*/, uint32_t /*flags*/) {
    return INVALID_OPERATION;
}

status_t BBinder::unlinkToDeath(const wp<DeathRecipient>& /*recipient*/, void* /*cookie*/, uint32_t /*flags*/,
                                wp<DeathRecipient>* /*outRecipient*/) {
    return INVALID_OPERATION;
}

void BBinder::attachObject(const void* objectID, void* object, void* cleanupCookie, object_cleanup_func func) {
    Extras* extras = getOrCreateExtras();
    std::lock_guard<std::mutex> lock(extras->mLock);
    // As libbinder's object manager: a second attach under one id is ignored.
    extras->mObjects.emplace(objectID, Extras::Attached{object, cleanupCookie, func});
}

void* BBinder::findObject(const void* objectID) const {
    Extras* extras = mExtras.load(std::memory_order_acquire);
    if (extras == nullptr) return nullptr;
    std::lock_guard<std::mutex> lock(extras->mLock);
    auto it = extras->mObjects.find(objectID);
    return it == extras->mObjects.end() ? nullptr : it->second.object;
}

void BBinder::detachObject(const void* objectID) {
    Extras* extras = mExtras.load(std::memory_order_acquire);
    if (extras == nullptr) return;
    std::lock_guard<std::mutex> lock(extras->mLock);
    extras->mObjects.erase(objectID);
}

BBinder* BBinder::localBinder() { return this; }

bool BBinder::isRequestingSid() {
    Extras* extras = mExtras.load(std::memory_order_acquire);
    if (extras == nullptr) return false;
    std::lock_guard<std::mutex> lock(extras->mLock);
    return extras->mRequestingSid;
}

void BBinder::setRequestingSid(bool requestSid) {
    Extras* extras = getOrCreateExtras();
    std::lock_guard<std::mutex> lock(extras->mLock);
    extras->mRequestingSid = requestSid;
}

sp<IBinder> BBinder::getExtension() {
    Extras* extras = mExtras.load(std::memory_order_acquire);
    if (extras == nullptr) return nullptr;
    std::lock_guard<std::mutex> lock(extras->mLock);
    return extras->mExtension;
}

void BBinder::setExtension(const sp<IBinder>& extension) {
    Extras* extras = getOrCreateExtras();
    std::lock_guard<std::mutex> lock(extras->mLock);
    extras->mExtension = extension;
}

pid_t BBinder::getDebugPid() { return getpid(); }

// ---------------------------------------------------------------------------
// BpRefBase
//
// The proxy takes one strong reference on the remote binder when it is made.
// Once the proxy itself is first held strongly, that reference belongs to the
// proxy's strong count and goes with its last strong reference; a proxy never
// held strongly gives it back in its destructor.

namespace {
constexpr int32_t kRemoteAcquired = 0x1;
}

BpRefBase::BpRefBase(const sp<IBinder>& o) : mRemote(o.get()), mRefs(nullptr), mState(0) {
    extendObjectLifetime(OBJECT_LIFETIME_WEAK);
    if (mRemote != nullptr) {
        mRemote->incStrong(this);
        mRefs = mRemote->createWeak(this);
    }
}

BpRefBase::~BpRefBase() {
    if (mRemote != nullptr) {
        if ((mState.load(std::memory_order_relaxed) & kRemoteAcquired) == 0) mRemote->decStrong(this);
        mRefs->decWeak(this);
    }
}

void BpRefBase::onFirstRef() { mState.fetch_or(kRemoteAcquired, std::memory_order_relaxed); }

void BpRefBase::onLastStrongRef(const void* /*id*/) {
    if (mRemote != nullptr) mRemote->decStrong(this);
}

bool BpRefBase::onIncStrongAttempted(uint32_t /*flags*/, const void* /*id*/) {
    return mRemote != nullptr && mRefs->attemptIncStrong(this);
}

// ---------------------------------------------------------------------------
// IInterface

IInterface::IInterface() : RefBase() {}

IInterface::~IInterface() {}

sp<IBinder> IInterface::asBinder(const IInterface* iface) {
    if (iface == nullptr) return nullptr;
    return const_cast<IInterface*>(iface)->onAsBinder();
}

sp<IBinder> IInterface::asBinder(const sp<IInterface>& iface) {
    if (iface == nullptr) return nullptr;
    return iface->onAsBinder();
}

}  // namespace android
