// The in-process service manager. Names are unique per case: the manager is
// one per process and cases may share a process.
#include <binder/Binder.h>
#include <binder/IServiceManager.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <thread>

using namespace android;

namespace {

bool listed(const Vector<String16>& names, const String16& name) {
    return std::find(names.begin(), names.end(), name) != names.end();
}

}  // namespace

TEST(ServiceManager, AddCheckReplaceAndList) {
    sp<IServiceManager> sm = defaultServiceManager();
    ASSERT_NE(nullptr, sm);
    EXPECT_EQ(sm, defaultServiceManager());
    const String16 name("sm.test.addCheckReplace");
    EXPECT_EQ(nullptr, sm->checkService(name));
    EXPECT_EQ(nullptr, sm->getService(name));  // neither waits
    EXPECT_FALSE(listed(sm->listServices(), name));

    sp<IBinder> first = new BBinder();
    const wp<IBinder> weakFirst = first;
    EXPECT_EQ(NO_ERROR, sm->addService(name, first));
    EXPECT_EQ(first, sm->getService(name));
    first.clear();
    EXPECT_NE(nullptr, weakFirst.promote());  // the manager keeps it alive...
    sp<IBinder> second = new BBinder();
    EXPECT_EQ(NO_ERROR, sm->addService(name, second));
    EXPECT_EQ(nullptr, weakFirst.promote());  // ...until it is replaced
    EXPECT_EQ(second, sm->checkService(name));
    Vector<String16> names = sm->listServices();
    EXPECT_EQ(1, std::count(names.begin(), names.end(), name));
    EXPECT_FALSE(sm->isDeclared(name));

    const String16 critical("sm.test.priority.critical");
    sm->addService(critical, new BBinder(), true, IServiceManager::DUMP_FLAG_PRIORITY_CRITICAL);
    EXPECT_TRUE(listed(sm->listServices(), critical));
    EXPECT_TRUE(listed(sm->listServices(IServiceManager::DUMP_FLAG_PRIORITY_CRITICAL), critical));
    EXPECT_FALSE(listed(sm->listServices(IServiceManager::DUMP_FLAG_PRIORITY_HIGH), critical));
    EXPECT_FALSE(listed(sm->listServices(IServiceManager::DUMP_FLAG_PRIORITY_HIGH), name));
}

TEST(ServiceManager, RefusesNullBindersAndBadNames) {
    sp<IServiceManager> sm = defaultServiceManager();
    EXPECT_EQ(BAD_VALUE, sm->addService(String16("sm.test.null"), nullptr));
    EXPECT_EQ(nullptr, sm->checkService(String16("sm.test.null")));
    EXPECT_EQ(BAD_VALUE, sm->addService(String16(""), new BBinder()));
    EXPECT_EQ(BAD_VALUE, sm->addService(String16(std::string(128, 'n').c_str()), new BBinder()));
    EXPECT_EQ(NO_ERROR, sm->addService(String16(std::string(127, 'n').c_str()), new BBinder()));
}

TEST(ServiceManager, WaitForServiceReturnsOnceItIsAdded) {
    sp<IServiceManager> sm = defaultServiceManager();
    const String16 name("sm.test.waitFor");
    sp<IBinder> service = new BBinder();
    std::atomic<bool> returned{false};
    sp<IBinder> got;
    std::thread waiter([&] {
        got = sm->waitForService(name);
        returned = true;
    });
    std::this_thread::sleep_for(std::chrono::milliseconds(50));
    EXPECT_FALSE(returned.load());
    sm->addService(name, service);
    waiter.join();
    EXPECT_EQ(service, got);
    EXPECT_EQ(service, sm->waitForService(name));
}
