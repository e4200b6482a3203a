#include "RemoteBinder.h"

namespace hostbinder {

using android::DEAD_OBJECT;
using android::NAME_NOT_FOUND;
using android::NO_ERROR;
using android::Parcel;
using android::sp;
using android::status_t;
using android::String16;
using android::wp;

RemoteBinder::RemoteBinder(Handler handler, const String16& descriptor)
    : mHandler(std::move(handler)), mDescriptor(descriptor) {}

RemoteBinder::~RemoteBinder() {
    for (const auto& [id, entry] : mObjects) {
        if (entry.func != nullptr) entry.func(id, entry.object, entry.cleanupCookie);
    }
}

bool RemoteBinder::kill() {
    std::vector<Obituary> obituaries;
    {
        std::lock_guard<std::mutex> lock(mLock);
        if (mDead) return false;
        mDead = true;
        obituaries.swap(mObituaries);
    }
    // Recipients run without the lock: they may call back into this binder.
    const wp<IBinder> who(this);
    for (const Obituary& obituary : obituaries) {
        sp<DeathRecipient> recipient = obituary.recipient.promote();
        if (recipient != nullptr) recipient->binderDied(who);
    }
    return true;
}

std::vector<RemoteBinder::Transaction> RemoteBinder::transactions() const {
    std::lock_guard<std::mutex> lock(mLock);
    return mTransactions;
}

size_t RemoteBinder::transactionCount() const {
    std::lock_guard<std::mutex> lock(mLock);
    return mTransactions.size();
}

bool RemoteBinder::waitForTransactions(size_t count, std::chrono::milliseconds timeout) const {
    std::unique_lock<std::mutex> lock(mLock);
    return mRecorded.wait_for(lock, timeout, [&] { return mTransactions.size() >= count; });
}

void RemoteBinder::clearTransactions() {
    std::lock_guard<std::mutex> lock(mLock);
    mTransactions.clear();
}

size_t RemoteBinder::deathRecipientCount() const {
    std::lock_guard<std::mutex> lock(mLock);
    return mObituaries.size();
}

const String16& RemoteBinder::getInterfaceDescriptor() const { return mDescriptor; }

bool RemoteBinder::isBinderAlive() const {
    std::lock_guard<std::mutex> lock(mLock);
    return !mDead;
}

status_t RemoteBinder::pingBinder() { return isBinderAlive() ? NO_ERROR : DEAD_OBJECT; }

status_t RemoteBinder::dump(int /*fd*/, const android::Vector<String16>& /*args*/) {
    return isBinderAlive() ? NO_ERROR : DEAD_OBJECT;
}

status_t RemoteBinder::transact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags) {
    Transaction record{code, std::vector<uint8_t>(data.data(), data.data() + data.dataSize()), flags};
    Parcel request;
    status_t err = request.setData(record.data.data(), record.data.size());
    if (err != NO_ERROR) return err;
    {
        std::lock_guard<std::mutex> lock(mLock);
        if (mDead) return DEAD_OBJECT;
        mTransactions.push_back(std::move(record));
    }
    mRecorded.notify_all();

    // The other side always has a reply parcel, even for a one-way call.
    Parcel remoteReply;
    err = mHandler ? mHandler(code, request, &remoteReply, flags) : NO_ERROR;

    if (!isBinderAlive()) return DEAD_OBJECT;
    // A failing handler sends its status alone, as the driver does.
    if (err < NO_ERROR || reply == nullptr || (flags & FLAG_ONEWAY) != 0) return err;
    status_t copied = reply->setData(remoteReply.data(), remoteReply.dataSize());
    return copied != NO_ERROR ? copied : err;
}

status_t RemoteBinder::linkToDeath(const sp<DeathRecipient>& recipient, void* cookie, uint32_t flags) {
    if (recipient == nullptr) return android::BAD_VALUE;
    std::lock_guard<std::mutex> lock(mLock);
    if (mDead) return DEAD_OBJECT;
    mObituaries.push_back(Obituary{recipient, cookie, flags});
    return NO_ERROR;
}

status_t RemoteBinder::unlinkToDeath(const wp<DeathRecipient>& recipient, void* cookie, uint32_t flags,
                                     wp<DeathRecipient>* outRecipient) {
    std::lock_guard<std::mutex> lock(mLock);
    if (mDead) return DEAD_OBJECT;
    // libbinder's match: the recipient, or with no recipient the cookie; the flags always.
    for (auto it = mObituaries.begin(); it != mObituaries.end(); ++it) {
        const bool sameRecipient = it->recipient == recipient || (recipient == nullptr && it->cookie == cookie);
        if (sameRecipient && it->flags == flags) {
            if (outRecipient != nullptr) *outRecipient = it->recipient;
            mObituaries.erase(it);
            return NO_ERROR;
        }
    }
    return NAME_NOT_FOUND;
}

void RemoteBinder::attachObject(const void* objectID, void* object, void* cleanupCookie,
                                object_cleanup_func func) {
    std::lock_guard<std::mutex> lock(mLock);
    mObjects.emplace(objectID, Attached{object, cleanupCookie, func});
}

void* RemoteBinder::findObject(const void* objectID) const {
    std::lock_guard<std::mutex> lock(mLock);
    auto it = mObjects.find(objectID);
    return it == mObjects.end() ? nullptr : it->second.object;
}

void RemoteBinder::detachObject(const void* objectID) {
    std::lock_guard<std::mutex> lock(mLock);
    mObjects.erase(objectID);
}

}  // namespace hostbinder
