// The service manager of a host process: an in-process name → binder table.
//
// On a device the service manager is another process that holds a reference
// to every registered binder for as long as the system runs. Here the table
// lives as long as the process: it is never destroyed, so a registered
// service is never torn down during static destruction, as it never is on a
// device.
#include <binder/IServiceManager.h>

#include <binder/Parcel.h>

#include <condition_variable>
#include <map>
#include <mutex>

namespace android {

IServiceManager::IServiceManager() {}

IServiceManager::~IServiceManager() {}

const String16& IServiceManager::getInterfaceDescriptor() const {
    static const String16 descriptor("android.os.IServiceManager");
    return descriptor;
}

namespace {

// The old service manager's limit on a name's length.
constexpr size_t kMaxServiceNameLength = 127;

class HostServiceManager : public IServiceManager, public BBinder {
public:
    sp<IBinder> getService(const String16& name) const override { return checkService(name); }

    sp<IBinder> checkService(const String16& name) const override {
        std::lock_guard<std::mutex> lock(mLock);
        auto it = mServices.find(name);
        return it == mServices.end() ? nullptr : it->second.binder;
    }

    status_t addService(const String16& name, const sp<IBinder>& service, bool allowIsolated,
                        int dumpsysFlags) override {
        if (service == nullptr || name.size() == 0 || name.size() > kMaxServiceNameLength) return BAD_VALUE;
        {
            std::lock_guard<std::mutex> lock(mLock);
            // A second registration under a name replaces the first.
            mServices[name] = Entry{service, allowIsolated, dumpsysFlags};
        }
        mAdded.notify_all();
        return NO_ERROR;
    }

    Vector<String16> listServices(int dumpsysFlags) override {
        Vector<String16> names;
        std::lock_guard<std::mutex> lock(mLock);
        for (const auto& [name, entry] : mServices) {
            if ((entry.dumpsysFlags & dumpsysFlags) != 0) names.push_back(name);
        }
        return names;
    }

    sp<IBinder> waitForService(const String16& name) override {
        std::unique_lock<std::mutex> lock(mLock);
        mAdded.wait(lock, [&] { return mServices.count(name) != 0; });
        return mServices[name].binder;
    }

    // A host has no VINTF manifest.
    bool isDeclared(const String16& /*name*/) override { return false; }

    const String16& getInterfaceDescriptor() const override { return IServiceManager::getInterfaceDescriptor(); }

    sp<IInterface> queryLocalInterface(const String16& descriptor) override {
        if (descriptor == IServiceManager::getInterfaceDescriptor()) return static_cast<IServiceManager*>(this);
        return nullptr;
    }

protected:
    IBinder* onAsBinder() override { return this; }

private:
    struct Entry {
        sp<IBinder> binder;
        bool allowIsolated = false;
        int dumpsysFlags = 0;
    };

    mutable std::mutex mLock;
    std::condition_variable mAdded;
    std::map<String16, Entry> mServices;
};

struct DefaultManager {
    std::mutex lock;
    sp<IServiceManager> manager;
};

// Deliberately never destroyed (see the top of the file).
DefaultManager& defaultManager() {
    static DefaultManager* instance = new DefaultManager();
    return *instance;
}

}  // namespace

sp<IServiceManager> defaultServiceManager() {
    DefaultManager& d = defaultManager();
    std::lock_guard<std::mutex> lock(d.lock);
    if (d.manager == nullptr) d.manager = new HostServiceManager();
    return d.manager;
}

void setDefaultServiceManager(const sp<IServiceManager>& sm) {
    DefaultManager& d = defaultManager();
    std::lock_guard<std::mutex> lock(d.lock);
    d.manager = sm;
}

}  // namespace android
