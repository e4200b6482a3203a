// Where the system meets the binder stand-in, it must answer as a device
// does: a local binder's transact, its refusal of death links, the dump
// transaction with the caller's identity.
#include <binder/Binder.h>
#include <binder/IPCThreadState.h>
#include <binder/IServiceManager.h>
#include <binder/Parcel.h>
#include <binder/PermissionCache.h>
#include <gtest/gtest.h>
#include <unistd.h>
#include <utils/String8.h>

#include <string>
#include <vector>

#include "HostBinder.h"

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

// Writes what reached dump, and who asked, to the descriptor it was given.
class DumpingBinder : public BBinder {
public:
    status_t dump(int fd, const Vector<String16>& args) override {
        const IPCThreadState* ipc = IPCThreadState::self();
        std::string text = std::to_string(ipc->getCallingPid()) + "/" + std::to_string(ipc->getCallingUid());
        for (const String16& arg : args) text += " " + std::string(String8(arg).string());
        text += PermissionCache::checkCallingPermission(String16("android.permission.DUMP")) ? " granted" : " denied";
        return write(fd, text.data(), text.size()) == static_cast<ssize_t>(text.size()) ? NO_ERROR : -errno;
    }
};

std::string dumpOf(const sp<IBinder>& binder, const std::vector<std::string>& args) {
    status_t status = UNKNOWN_ERROR;
    const std::string text = hostbinder::dumpsys(binder, args, &status);
    return std::to_string(status) + ": " + text;
}

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

// The permission controller's answers and the caller's identity come from
// the control API; calls within the process carry its own identity.
TEST(BBinder, DumpTransactionReachesDumpWithTheCallersIdentity) {
    sp<IBinder> binder = new DumpingBinder();
    const std::string self = std::to_string(getpid()) + "/" + std::to_string(getuid());
    EXPECT_EQ("0: " + self + " --link -h granted", dumpOf(binder, {"--link", "-h"}));
    hostbinder::setClientIdentity(4242, 2000);
    EXPECT_EQ("0: 4242/2000 denied", dumpOf(binder, {}));
    hostbinder::setPermission("android.permission.DUMP", 2000, true);
    EXPECT_EQ("0: 4242/2000 granted", dumpOf(binder, {}));
    hostbinder::clearPermissions();
    hostbinder::setClientIdentity(4242, 0);  // root needs no grant
    EXPECT_EQ("0: 4242/0 granted", dumpOf(binder, {}));
    hostbinder::clearClientIdentity();
    EXPECT_EQ(getpid(), IPCThreadState::self()->getCallingPid());  // outside a transaction
    EXPECT_EQ("0: " + self + " granted", dumpOf(binder, {}));
    // A BBinder that does not dump writes nothing.
    EXPECT_EQ("0: ", dumpOf(new BBinder(), {"-a"}));
}
