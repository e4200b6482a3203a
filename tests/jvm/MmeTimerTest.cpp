// The runtime's timer and module messages run through Java: upcalls made
// from the engine's own threads, the expiry report with its time arithmetic,
// the state before sysInit, Java exceptions in upcalls and thread detaching.
#include <android/log.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <mutex>
#include <set>
#include <string>
#include <vector>

#include "HostFakes.h"
#include "JvmHarness.h"
#include "MmeJni.h"

using namespace jvmtest;
using ::testing::ElementsAre;
using ::testing::MatchesRegex;
using V = std::vector<std::string>;

namespace {

constexpr const char* kBridgeTag = "Mme_JNI";

std::mutex gExpiryLock;
std::vector<bool> gExpiries;

void onExpiry(bool flag) {
    std::lock_guard<std::mutex> lock(gExpiryLock);
    gExpiries.push_back(flag);
}

std::vector<bool> expiries() {
    std::lock_guard<std::mutex> lock(gExpiryLock);
    return gExpiries;
}

class MmeTimerTest : public JvmCase {
protected:
    void SetUp() override {
        JvmCase::SetUp();
        load();
    }
    static void startBridge() { ASSERT_EQ(0, mme("sysInit", "()I")); }
    static jint timerActive() { return mme("zpandTimerActive", "()I"); }
    // The expiry report at a given runtime time, and what it called.
    static std::pair<jint, V> reportAt(unsigned int now) {
        hostfakes::setZosTime(now);
        const size_t mark = hostfakes::callCount();
        const jint late = timerActive();
        return {late, hostfakes::callTextsSince(mark)};
    }
};

const V kExpired = {"Zos_TimerActive(0) = 0"};

}  // namespace

TEST_F(MmeTimerTest, BeforeSysInitUpcallsDoNothing) {
    JVM_REQUIRE_FRESH_PROCESS();
    EXPECT_EQ(0, timerActive());
    EXPECT_TRUE(hostfakes::callTexts().empty());

    const std::vector<int> results = onNativeThread([] {
        return std::vector<int>{android::JniZpandModPostDrv(), android::JniZpandTimerInit(),
                                android::JniZpandTimerDestroy(), android::JniZpandTimerStart(5000, onExpiry),
                                android::JniZpandTimerStop()};
    });
    EXPECT_EQ((std::vector<int>{0, 0, 0, 0, 0}), results);
    EXPECT_TRUE(upcalls().empty());
    EXPECT_EQ((V{"JniZpandTimerInit", "JniZpandTimerDestroy", "JniZpandTimerStart", "JniZpandTimerStop"}),
              bridgeLines(log));

    // The start kept the runtime's callback, with no expiry time set.
    hostfakes::setZosTime(40);
    EXPECT_EQ(40, timerActive());
    EXPECT_EQ(std::vector<bool>{false}, expiries());
}

TEST_F(MmeTimerTest, StartReportAndStopDriveTheOneTimer) {
    startBridge();
    hostfakes::setZosTime(100);
    EXPECT_EQ(0, hostfakes::fireZpandTimerStart(5000));
    EXPECT_THAT(upcalls(), ElementsAre(onAttachedThread("zpandTimerStart(5000)")));
    EXPECT_TRUE(log.contains(ANDROID_LOG_INFO, kBridgeTag, "JniZpandTimerStart"));

    // Expiry at 105: late by 2, early by 1.
    EXPECT_EQ(std::make_pair(jint{2}, kExpired), reportAt(107));
    EXPECT_EQ(std::make_pair(jint{-1}, kExpired), reportAt(104));
    // Lengths count thousandths: 999 expires at once.
    ASSERT_EQ(0, hostfakes::fireZpandTimerStart(999));
    EXPECT_EQ(std::make_pair(jint{0}, kExpired), reportAt(104));

    // A stop forgets the expiry time but not the callback.
    setUpcallResult(9);
    EXPECT_EQ(9, hostfakes::fireZpandTimerStop());
    EXPECT_THAT(upcalls().back(), onAttachedThread("zpandTimerStop()"));
    EXPECT_TRUE(log.contains(ANDROID_LOG_INFO, kBridgeTag, "JniZpandTimerStop"));
    EXPECT_EQ(std::make_pair(jint{300}, kExpired), reportAt(300));

    // A length beyond 2^31 reaches Java as a positive long.
    hostfakes::setZosTime(10);
    EXPECT_EQ(9, hostfakes::fireZpandTimerStart(3000000000u));
    EXPECT_THAT(upcalls().back(), onAttachedThread("zpandTimerStart(3000000000)"));
    EXPECT_EQ(std::make_pair(jint{-3000000}, kExpired), reportAt(10));
}

TEST_F(MmeTimerTest, InitDestroyAndModuleDriveAreForwarded) {
    startBridge();
    setUpcallResult(4);
    EXPECT_EQ(4, hostfakes::fireZpandTimerInit());
    EXPECT_EQ(4, hostfakes::fireZpandTimerDestroy());
    EXPECT_EQ(4, hostfakes::fireZpandModPostDrv());
    const V calls = upcalls();
    ASSERT_EQ(3u, calls.size());
    EXPECT_THAT(calls[0], onAttachedThread("zpandTimerInit()"));
    EXPECT_THAT(calls[1], onAttachedThread("zpandTimerDestroy()"));
    EXPECT_THAT(calls[2], onAttachedThread("zpandModPostDrv()"));
    // The post-drive upcall logs nothing of its own.
    const V lines = bridgeLines(log);
    EXPECT_EQ((V{"JniZpandTimerInit", "JniZpandTimerDestroy"}), V(lines.end() - 2, lines.end()));

    // Java answers a post-drive by driving the messages on its own thread.
    const size_t mark = hostfakes::callCount();
    EXPECT_EQ(0, mme("zpandModDriveMsg", "()I"));
    hostfakes::setResult("Zos_ModDriveMsg", -5);
    EXPECT_EQ(0, mme("zpandModDriveMsg", "()I"));
    EXPECT_EQ((V{"Zos_ModDriveMsg() = 0", "Zos_ModDriveMsg() = -5"}), hostfakes::callTextsSince(mark));
}

TEST_F(MmeTimerTest, AThrowingUpcallIsClearedAndTheThreadGoesOn) {
    startBridge();
    setUpcallThrowing(true);
    EXPECT_EQ(0, hostfakes::fireZpandModPostDrv());
    EXPECT_EQ(0, hostfakes::fireZpandTimerInit());
    EXPECT_EQ(0, hostfakes::fireZpandTimerDestroy());
    EXPECT_EQ(0, hostfakes::fireZpandTimerStart(1000));
    EXPECT_EQ(0, hostfakes::fireZpandTimerStop());
    for (const char* upcall : {"JniZpandModPostDrv", "JniZpandTimerInit", "JniZpandTimerDestroy",
                               "JniZpandTimerStart", "JniZpandTimerStop"}) {
        const std::string cleared = std::string(upcall) + ": Java exception cleared";
        EXPECT_TRUE(log.contains(ANDROID_LOG_ERROR, kBridgeTag, cleared)) << upcall;
    }
    EXPECT_EQ(5u, upcalls().size());

    // One engine thread making two upcalls in a row: the second still runs.
    clearUpcalls();
    onNativeThread([] { return android::JniZpandTimerInit() + android::JniZpandTimerDestroy(); });
    EXPECT_THAT(upcalls(), ElementsAre(onAttachedThread("zpandTimerInit()"),
                                       onAttachedThread("zpandTimerDestroy()")));

    // On a thread that stays attached, nothing is left pending.
    EXPECT_EQ(0, android::JniZpandTimerInit());
    EXPECT_FALSE(env()->ExceptionCheck());
    EXPECT_EQ("zpandTimerInit() on main", upcalls().back());
}

TEST_F(MmeTimerTest, EveryEngineThreadIsDetachedAfterItsUpcall) {
    startBridge();
    hostfakes::fireZpandModPostDrv();
    hostfakes::fireZpandTimerInit();
    hostfakes::fireZpandTimerStart(1000);
    hostfakes::fireZpandTimerStop();
    hostfakes::fireZpandTimerDestroy();
    std::set<std::string> threads;
    for (const std::string& call : upcalls()) {
        const std::string thread = threadOf(call);
        EXPECT_THAT(thread, MatchesRegex("Thread-[0-9]+"));
        EXPECT_FALSE(javaThreadAlive(thread)) << call;
        threads.insert(thread);
    }
    EXPECT_EQ(5u, threads.size());

    const jint state = onNativeThread([] {
        android::JniZpandTimerInit();
        void* e = nullptr;
        return jvm()->GetEnv(&e, JNI_VERSION_1_4);
    });
    EXPECT_EQ(JNI_EDETACHED, state);

    // The main thread is the JVM's own: it stays attached.
    android::JniZpandTimerInit();
    EXPECT_EQ("zpandTimerInit() on main", upcalls().back());
    void* e = nullptr;
    EXPECT_EQ(JNI_OK, jvm()->GetEnv(&e, JNI_VERSION_1_4));
}
