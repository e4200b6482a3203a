// The stand-in for a binder object of another process: bytes copied across,
// the transaction record, replies, death and its notices.
#include "RemoteBinder.h"

#include <binder/Parcel.h>
#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <mutex>
#include <thread>
#include <vector>

using namespace android;
using hostbinder::RemoteBinder;
using namespace std::chrono_literals;

namespace {

class Recipient : public IBinder::DeathRecipient {
public:
    void binderDied(const wp<IBinder>& who) override {
        std::lock_guard<std::mutex> lock(mLock);
        mDied.push_back(who);
    }
    std::vector<wp<IBinder>> died() const {
        std::lock_guard<std::mutex> lock(mLock);
        return mDied;
    }

private:
    mutable std::mutex mLock;
    std::vector<wp<IBinder>> mDied;
};

// Unlinks itself from inside the notice, as a client cleaning up would.
class UnlinkingRecipient : public IBinder::DeathRecipient {
public:
    status_t unlinkResult = NO_ERROR;
    void binderDied(const wp<IBinder>& who) override {
        sp<IBinder> binder = who.promote();
        unlinkResult = binder->unlinkToDeath(this);
    }
};

std::vector<uint8_t> ints(std::initializer_list<int32_t> values) {
    Parcel p;
    for (int32_t v : values) p.writeInt32(v);
    return std::vector<uint8_t>(p.data(), p.data() + p.dataSize());
}

}  // namespace

TEST(RemoteBinder, HandlerGetsACopyOfTheBytesFromTheStartAndTheRecordKeepsThem) {
    std::vector<int32_t> seen;
    const Parcel* seenParcel = nullptr;
    sp<RemoteBinder> remote = new RemoteBinder([&](uint32_t, const Parcel& data, Parcel*, uint32_t) {
        seenParcel = &data;
        EXPECT_EQ(0u, data.dataPosition());
        while (data.dataAvail() >= 4) seen.push_back(data.readInt32());
        return NO_ERROR;
    });

    Parcel one;
    one.writeInt32(7);
    Parcel four;
    for (int32_t v : {1, 2, 3, 4}) four.writeInt32(v);
    Parcel reply;
    EXPECT_EQ(NO_ERROR, remote->transact(0, one, &reply));
    EXPECT_NE(&one, seenParcel);
    EXPECT_EQ(NO_ERROR, remote->transact(1, four, &reply, IBinder::FLAG_ONEWAY));
    EXPECT_EQ((std::vector<int32_t>{7, 1, 2, 3, 4}), seen);
    // The caller's parcels are left where they were.
    EXPECT_EQ(4u, one.dataPosition());

    std::vector<RemoteBinder::Transaction> record = remote->transactions();
    ASSERT_EQ(2u, record.size());
    EXPECT_EQ(2u, remote->transactionCount());
    EXPECT_EQ(0u, record[0].code);
    EXPECT_EQ(4u, record[0].data.size());
    EXPECT_EQ(ints({7}), record[0].data);
    EXPECT_EQ(0u, record[0].flags);
    EXPECT_EQ(1u, record[1].code);
    EXPECT_EQ(16u, record[1].data.size());
    EXPECT_EQ(ints({1, 2, 3, 4}), record[1].data);
    EXPECT_EQ(static_cast<uint32_t>(IBinder::FLAG_ONEWAY), record[1].flags);

    remote->clearTransactions();
    EXPECT_EQ(0u, remote->transactionCount());
}

TEST(RemoteBinder, ReplyBytesComeBackFromTheStartUnlessTheHandlerFails) {
    status_t result = NO_ERROR;
    sp<RemoteBinder> remote = new RemoteBinder([&](uint32_t code, const Parcel&, Parcel* reply, uint32_t) {
        reply->writeInt32(static_cast<int32_t>(code) * 10);
        return result;
    });
    Parcel data;
    Parcel reply;
    EXPECT_EQ(NO_ERROR, remote->transact(4, data, &reply));
    EXPECT_EQ(0u, reply.dataPosition());
    EXPECT_EQ(40, reply.readInt32());

    result = UNKNOWN_TRANSACTION;
    Parcel untouched;
    EXPECT_EQ(UNKNOWN_TRANSACTION, remote->transact(5, data, &untouched));
    EXPECT_EQ(0u, untouched.dataSize());
    EXPECT_EQ(0, untouched.readInt32());

    // No reply parcel: nothing to copy into.
    result = NO_ERROR;
    EXPECT_EQ(NO_ERROR, remote->transact(6, data, nullptr));

    // Without a handler every call succeeds with an empty reply.
    sp<RemoteBinder> silent = new RemoteBinder();
    Parcel stale;
    stale.writeInt32(99);
    EXPECT_EQ(NO_ERROR, silent->transact(0, data, &stale));
    EXPECT_EQ(0u, stale.dataSize());
    EXPECT_EQ(1u, silent->transactionCount());
}

TEST(RemoteBinder, LooksLikeAProxyOfItsDescriptor) {
    sp<RemoteBinder> remote = new RemoteBinder(RemoteBinder::Handler(), String16("android.test.IRemote"));
    EXPECT_EQ(String16("android.test.IRemote"), remote->getInterfaceDescriptor());
    sp<RemoteBinder> plain = new RemoteBinder();
    EXPECT_EQ(0u, plain->getInterfaceDescriptor().size());
    EXPECT_EQ(nullptr, remote->queryLocalInterface(String16("android.test.IRemote")));
    EXPECT_EQ(nullptr, remote->localBinder());
    EXPECT_EQ(nullptr, remote->remoteBinder());
    EXPECT_TRUE(remote->isBinderAlive());
    EXPECT_EQ(NO_ERROR, remote->pingBinder());
}

TEST(RemoteBinder, KillDeliversOneNoticePerLinkAndThenRefusesCalls) {
    std::atomic<int> handled{0};
    sp<RemoteBinder> remote = new RemoteBinder([&](uint32_t, const Parcel&, Parcel*, uint32_t) {
        ++handled;
        return NO_ERROR;
    });
    sp<Recipient> a = new Recipient();
    sp<Recipient> b = new Recipient();
    int cookie = 0;
    EXPECT_EQ(NO_ERROR, remote->linkToDeath(a));
    EXPECT_EQ(NO_ERROR, remote->linkToDeath(b, &cookie, 0));
    EXPECT_EQ(2u, remote->deathRecipientCount());

    EXPECT_TRUE(remote->kill());
    ASSERT_EQ(1u, a->died().size());
    ASSERT_EQ(1u, b->died().size());
    EXPECT_EQ(remote.get(), a->died()[0].unsafe_get());
    EXPECT_EQ(0u, remote->deathRecipientCount());

    EXPECT_FALSE(remote->kill());
    EXPECT_EQ(1u, a->died().size());
    EXPECT_EQ(1u, b->died().size());

    EXPECT_FALSE(remote->isBinderAlive());
    EXPECT_EQ(DEAD_OBJECT, remote->pingBinder());
    Parcel data;
    data.writeInt32(1);
    Parcel reply;
    EXPECT_EQ(DEAD_OBJECT, remote->transact(0, data, &reply));
    EXPECT_EQ(0, handled.load());
    EXPECT_EQ(0u, remote->transactionCount());
    EXPECT_EQ(0, reply.readInt32());
    EXPECT_EQ(DEAD_OBJECT, remote->linkToDeath(a));
    EXPECT_EQ(DEAD_OBJECT, remote->unlinkToDeath(a));
}

TEST(RemoteBinder, UnlinkRemovesTheMatchingLinkOnly) {
    sp<RemoteBinder> remote = new RemoteBinder();
    sp<Recipient> a = new Recipient();
    sp<Recipient> b = new Recipient();
    sp<Recipient> stranger = new Recipient();
    int cookie = 0;
    remote->linkToDeath(a);
    remote->linkToDeath(b, &cookie, 0);
    EXPECT_EQ(NAME_NOT_FOUND, remote->unlinkToDeath(stranger));
    EXPECT_EQ(NAME_NOT_FOUND, remote->unlinkToDeath(a, nullptr, 1));  // the flags must match
    wp<IBinder::DeathRecipient> removed;
    EXPECT_EQ(NO_ERROR, remote->unlinkToDeath(a, nullptr, 0, &removed));
    EXPECT_EQ(a.get(), removed.unsafe_get());
    EXPECT_EQ(NAME_NOT_FOUND, remote->unlinkToDeath(a));
    EXPECT_EQ(1u, remote->deathRecipientCount());
    // With no recipient, the cookie names the link.
    EXPECT_EQ(NO_ERROR, remote->unlinkToDeath(nullptr, &cookie));
    EXPECT_EQ(0u, remote->deathRecipientCount());

    remote->kill();
    EXPECT_TRUE(a->died().empty());
    EXPECT_TRUE(b->died().empty());
    EXPECT_EQ(BAD_VALUE, remote->linkToDeath(nullptr));
}

TEST(RemoteBinder, RecipientsAreHeldWeaklyAndMayCallBackWhileNotified) {
    sp<RemoteBinder> remote = new RemoteBinder();
    wp<Recipient> gone;
    {
        sp<Recipient> shortLived = new Recipient();
        gone = shortLived;
        remote->linkToDeath(shortLived);
    }
    EXPECT_EQ(nullptr, gone.promote());
    sp<UnlinkingRecipient> unlinking = new UnlinkingRecipient();
    remote->linkToDeath(unlinking);
    EXPECT_EQ(2u, remote->deathRecipientCount());
    remote->kill();  // must neither deadlock nor touch the dropped recipient
    EXPECT_EQ(DEAD_OBJECT, unlinking->unlinkResult);
}

TEST(RemoteBinder, DeathDuringASlowCallFailsThatCall) {
    std::atomic<bool> inHandler{false};
    sp<RemoteBinder> remote = new RemoteBinder([&](uint32_t, const Parcel&, Parcel* reply, uint32_t) {
        inHandler = true;
        std::this_thread::sleep_for(100ms);
        reply->writeInt32(1);
        return NO_ERROR;
    });
    status_t result = NO_ERROR;
    Parcel reply;
    std::thread caller([&] {
        Parcel data;
        result = remote->transact(0, data, &reply);
    });
    EXPECT_TRUE(remote->waitForTransactions(1, 5s));
    // The record is made before the handler runs; wait until it is running.
    const auto deadline = std::chrono::steady_clock::now() + 5s;
    while (!inHandler.load() && std::chrono::steady_clock::now() < deadline) std::this_thread::sleep_for(1ms);
    EXPECT_TRUE(inHandler.load());
    remote->kill();
    caller.join();
    EXPECT_EQ(DEAD_OBJECT, result);
    EXPECT_EQ(0u, reply.dataSize());
}

TEST(RemoteBinder, TransactionsFromManyThreadsAreAllRecorded) {
    sp<RemoteBinder> remote = new RemoteBinder([](uint32_t, const Parcel& data, Parcel* reply, uint32_t) {
        return reply->writeInt32(data.readInt32());
    });
    EXPECT_FALSE(remote->waitForTransactions(1, 10ms));
    std::vector<std::thread> threads;
    std::atomic<int> mismatches{0};
    for (int t = 0; t < 4; ++t) {
        threads.emplace_back([&, t] {
            for (int i = 0; i < 50; ++i) {
                Parcel data;
                data.writeInt32(t * 1000 + i);
                Parcel reply;
                if (remote->transact(0, data, &reply) != NO_ERROR || reply.readInt32() != t * 1000 + i) ++mismatches;
            }
        });
    }
    EXPECT_TRUE(remote->waitForTransactions(200, 5s));
    for (auto& t : threads) t.join();
    EXPECT_EQ(0, mismatches.load());
    EXPECT_EQ(200u, remote->transactionCount());
}
