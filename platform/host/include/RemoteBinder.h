// A binder object that lives in another process, for host tests and tools.
//
// On a device a binder from another process reaches the system as a proxy:
// a call is marshalled into bytes by the driver, runs in the other process,
// and the other process can die, which the driver reports to every linked
// death recipient. RemoteBinder plays that part in one host process:
//
// - transact() hands the handler a fresh Parcel holding a copy of the
//   request's bytes (read position 0), as the driver would deliver it, and
//   on success copies the handler's reply bytes into the caller's reply
//   (read position 0). Binder references inside the bytes are not carried
//   across. The handler runs on the calling thread, synchronously, also for
//   FLAG_ONEWAY; a slow client is a handler that sleeps. An empty handler
//   answers every call with NO_ERROR and an empty reply.
// - Every transaction that reaches the handler is recorded (code, request
//   bytes, flags) before the handler runs; tests read the record back.
// - kill() stands for the death of the other process: later calls fail with
//   DEAD_OBJECT without reaching the handler, a call in progress returns
//   DEAD_OBJECT when its handler comes back, and each link made with
//   linkToDeath delivers binderDied once (outside the binder's lock, on the
//   thread that calls kill()).
//
// Like a proxy, it is not a local binder: queryLocalInterface, localBinder
// and remoteBinder answer null, so asInterface wraps it in the interface's
// proxy class. Death recipients are held weakly, as libbinder holds them.
#ifndef QUELLBORN_HOST_REMOTEBINDER_H
#define QUELLBORN_HOST_REMOTEBINDER_H

#include <binder/IBinder.h>
#include <binder/Parcel.h>

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <functional>
#include <map>
#include <mutex>
#include <vector>

namespace hostbinder {

class RemoteBinder : public android::IBinder {
public:
    using Handler = std::function<android::status_t(uint32_t code, const android::Parcel& data,
                                                    android::Parcel* reply, uint32_t flags)>;

    struct Transaction {
        uint32_t code = 0;
        std::vector<uint8_t> data;  // the request's bytes as sent
        uint32_t flags = 0;
    };

    explicit RemoteBinder(Handler handler = Handler(),
                          const android::String16& descriptor = android::String16());

    // The other process dies. Returns false if it was already dead.
    bool kill();

    // Transactions that reached the handler, oldest first.
    std::vector<Transaction> transactions() const;
    size_t transactionCount() const;
    // Waits until at least `count` transactions have been recorded.
    bool waitForTransactions(size_t count, std::chrono::milliseconds timeout) const;
    void clearTransactions();

    size_t deathRecipientCount() const;

    // IBinder
    const android::String16& getInterfaceDescriptor() const override;
    bool isBinderAlive() const override;
    android::status_t pingBinder() override;
    android::status_t dump(int fd, const android::Vector<android::String16>& args) override;
    // NOLINTNEXTLINE(google-default-arguments)
    android::status_t transact(uint32_t code, const android::Parcel& data, android::Parcel* reply,
                               uint32_t flags = 0) override;
    // NOLINTNEXTLINE(google-default-arguments)
    android::status_t linkToDeath(const android::sp<DeathRecipient>& recipient, void* cookie = nullptr,
                                  uint32_t flags = 0) override;
    // NOLINTNEXTLINE(google-default-arguments)
    android::status_t unlinkToDeath(const android::wp<DeathRecipient>& recipient, void* cookie = nullptr,
                                    uint32_t flags = 0,
                                    android::wp<DeathRecipient>* outRecipient = nullptr) override;
    void attachObject(const void* objectID, void* object, void* cleanupCookie,
                      object_cleanup_func func) override;
    void* findObject(const void* objectID) const override;
    void detachObject(const void* objectID) override;

protected:
    ~RemoteBinder() override;

private:
    struct Obituary {
        android::wp<DeathRecipient> recipient;
        void* cookie;
        uint32_t flags;
    };
    struct Attached {
        void* object;
        void* cleanupCookie;
        object_cleanup_func func;
    };

    const Handler mHandler;
    const android::String16 mDescriptor;

    mutable std::mutex mLock;
    mutable std::condition_variable mRecorded;
    bool mDead = false;
    std::vector<Transaction> mTransactions;
    std::vector<Obituary> mObituaries;
    std::map<const void*, Attached> mObjects;
};

}  // namespace hostbinder

#endif  // QUELLBORN_HOST_REMOTEBINDER_H
