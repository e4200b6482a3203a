// Where the system meets the binder stand-in, it must answer as a device
// does: a local binder's transact, its refusal of death links, and the
// service manager's replacement of a name.
#include <binder/Binder.h>
#include <binder/IServiceManager.h>
#include <binder/Parcel.h>
#include <gtest/gtest.h>

using namespace android;

namespace {

class EchoBinder : public BBinder {
public:
    static constexpr uint32_t kEcho = IBinder::FIRST_CALL_TRANSACTION;

protected:
    status_t onTransact(uint32_t code, const Parcel& data, Parcel* reply, uint32_t flags) override {
        if (code != kEcho) return BBinder::onTransact(code, data, reply, flags);
        return reply->writeInt32(data.readInt32() + 1);
    }
};

class NoDeath : public IBinder::DeathRecipient {
    void binderDied(const wp<IBinder>&) override {}
};

}  // namespace

TEST(BBinder, TransactReadsFromTheStartAndLeavesUnknownCodesUnanswered) {
    sp<EchoBinder> binder = new EchoBinder();
    Parcel data, echoed, reply;
    data.writeInt32(41);  // leaves the position at 4
    EXPECT_EQ(NO_ERROR, binder->transact(EchoBinder::kEcho, data, &echoed));
    EXPECT_EQ(42, echoed.readInt32());
    EXPECT_EQ(NO_ERROR, binder->pingBinder());
    EXPECT_EQ(NO_ERROR, binder->transact(IBinder::INTERFACE_TRANSACTION, data, &reply));
    EXPECT_EQ(String16(), reply.readString16());
    for (uint32_t code : {0u, EchoBinder::kEcho + 1, 0xffffffffu}) {
        Parcel r;
        EXPECT_EQ(UNKNOWN_TRANSACTION, binder->transact(code, data, &r)) << code;
        EXPECT_EQ(0u, r.dataSize()) << code;
    }
    // A local binder cannot die on its own: linking is refused.
    EXPECT_EQ(INVALID_OPERATION, binder->linkToDeath(new NoDeath()));
}

TEST(ServiceManager, AddingANameAgainReplacesAndReleasesTheFirstService) {
    sp<IServiceManager> sm = defaultServiceManager();
    const String16 name("sm.test.replace");
    EXPECT_EQ(nullptr, sm->checkService(name));
    sp<IBinder> first = new BBinder();
    const wp<IBinder> weakFirst = first;
    ASSERT_EQ(NO_ERROR, sm->addService(name, first));
    first.clear();
    EXPECT_NE(nullptr, weakFirst.promote());  // the manager keeps it alive...
    sp<IBinder> second = new BBinder();
    ASSERT_EQ(NO_ERROR, sm->addService(name, second));
    EXPECT_EQ(nullptr, weakFirst.promote());  // ...until it is replaced
    EXPECT_EQ(second, sm->checkService(name));
    EXPECT_EQ(BAD_VALUE, sm->addService(String16("sm.test.null"), nullptr));
}
