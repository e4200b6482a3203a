// The stand-in for a binder object of another process where it must be as
// harsh as the device: death and its notices, a death during a call, and a
// nested call run on the waiting thread.
#include "RemoteBinder.h"

#include <binder/Parcel.h>
#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <thread>

#include "Eventually.h"

using namespace android;
using hostbinder::RemoteBinder;
using namespace std::chrono_literals;

namespace {

// Counts its notices.
struct Recipient : IBinder::DeathRecipient {
    void binderDied(const wp<IBinder>& who) override {
        ++deaths;
        from = who.unsafe_get();
    }
    int deaths = 0;
    IBinder* from = nullptr;
};

}  // namespace

TEST(RemoteBinder, IsAProxyOfItsDescriptorUntilKilledThenNotifiesEachLinkOnceAndRefusesCalls) {
    std::atomic<int> handled{0};
    const String16 descriptor("android.test.IRemote");
    RemoteBinder::Handler counting = [&](uint32_t, const Parcel&, Parcel*, uint32_t) {
        ++handled;
        return NO_ERROR;
    };
    sp<RemoteBinder> remote = new RemoteBinder(counting, descriptor);
    EXPECT_EQ(descriptor, remote->getInterfaceDescriptor());
    EXPECT_EQ(nullptr, remote->queryLocalInterface(descriptor));
    sp<Recipient> a = new Recipient();
    sp<Recipient> b = new Recipient();
    int cookie = 0;
    EXPECT_EQ(NO_ERROR, remote->linkToDeath(a));
    EXPECT_EQ(NO_ERROR, remote->linkToDeath(b, &cookie, 0));
    EXPECT_EQ(2u, remote->deathRecipientCount());
    EXPECT_TRUE(remote->isBinderAlive());
    EXPECT_EQ(NO_ERROR, remote->pingBinder());

    EXPECT_TRUE(remote->kill());
    EXPECT_FALSE(remote->kill());  // already dead: no second notice
    EXPECT_EQ(1, a->deaths);
    EXPECT_EQ(1, b->deaths);
    EXPECT_EQ(remote.get(), a->from);
    EXPECT_EQ(0u, remote->deathRecipientCount());

    EXPECT_FALSE(remote->isBinderAlive());
    EXPECT_EQ(DEAD_OBJECT, remote->pingBinder());
    Parcel data, reply;
    data.writeInt32(1);
    EXPECT_EQ(DEAD_OBJECT, remote->transact(0, data, &reply));
    EXPECT_EQ(0, handled.load());
    EXPECT_EQ(0u, remote->transactionCount());
}

TEST(RemoteBinder, DeathDuringASlowCallFailsThatCall) {
    std::atomic<bool> inHandler{false};
    sp<RemoteBinder> remote = new RemoteBinder([&](uint32_t, const Parcel&, Parcel* reply, uint32_t) {
        inHandler = true;
        std::this_thread::sleep_for(100ms);
        return reply->writeInt32(1);
    });
    status_t result = NO_ERROR;
    Parcel data, reply;
    std::thread caller([&] { result = remote->transact(0, data, &reply); });
    // The record is made before the handler runs; wait until it is running.
    ASSERT_TRUE(eventually([&] { return inHandler.load(); }));
    remote->kill();
    caller.join();
    EXPECT_EQ(DEAD_OBJECT, result);
    EXPECT_EQ(0u, reply.dataSize());
}

// The driver runs a call that the other process makes while being called
// (back into this process) on the thread waiting for its reply; a handler
// that calls back here therefore reaches that thread's locks.
TEST(RemoteBinder, ACallBackFromTheHandlerRunsOnTheThreadWaitingForTheReply) {
    struct Local : BBinder {
        status_t onTransact(uint32_t, const Parcel&, Parcel* reply, uint32_t) override {
            ranOn = std::this_thread::get_id();
            return reply->writeInt32(5);
        }
        std::thread::id ranOn;
    };
    sp<Local> local = new Local();
    sp<RemoteBinder> remote = new RemoteBinder([&](uint32_t, const Parcel&, Parcel* reply, uint32_t) {
        Parcel request, answer;
        EXPECT_EQ(NO_ERROR, local->transact(IBinder::FIRST_CALL_TRANSACTION, request, &answer));
        return reply->writeInt32(answer.readInt32());
    });
    std::thread::id caller;
    Parcel data, reply;
    std::thread([&] {
        caller = std::this_thread::get_id();
        EXPECT_EQ(NO_ERROR, remote->transact(0, data, &reply));
    }).join();
    EXPECT_EQ(caller, local->ranOn);
    EXPECT_EQ(5, reply.readInt32());
}
