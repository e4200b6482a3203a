// The runtime's timer and module messages run through Java: upcalls made
// from the engine's own threads, the expiry report with its time arithmetic,
// the state before sysInit, Java exceptions in upcalls and thread detaching.
#include <functional>
#include <set>

#include "JvmHarness.h"
#include "MmeJni.h"

using namespace jvmtest;
using ::testing::ElementsAre;

namespace {

// What the runtime's expiry callback got (set on an engine thread, called
// on the main one after that thread has ended).
std::vector<bool> gExpiries;
void onExpiry(bool flag) { gExpiries.push_back(flag); }

// The five upcalls as the engine's threads make them: the bridge function,
// the Java entry it records, and how a test fires it.
struct Upcall {
    const char* bridge;
    const char* java;
    std::function<int()> fire;
};
const std::vector<Upcall> kUpcalls = {
        {"JniZpandTimerInit", "zpandTimerInit()", hostfakes::fireZpandTimerInit},
        {"JniZpandTimerDestroy", "zpandTimerDestroy()", hostfakes::fireZpandTimerDestroy},
        {"JniZpandModPostDrv", "zpandModPostDrv()", hostfakes::fireZpandModPostDrv},
        {"JniZpandTimerStart", "zpandTimerStart(1000)", [] { return hostfakes::fireZpandTimerStart(1000); }},
        {"JniZpandTimerStop", "zpandTimerStop()", hostfakes::fireZpandTimerStop},
};
// Every upcall but the post-drive logs its name.
const V kUpcallLines = {"JniZpandTimerInit", "JniZpandTimerDestroy", "JniZpandTimerStart",
                        "JniZpandTimerStop"};
const V kExpired = {"Zos_TimerActive(0) = 0"};

jint timerActive() { return mme("zpandTimerActive", "()I"); }

// The expiry report at a given runtime time, and what it called.
std::pair<jint, V> reportAt(unsigned int now) {
    hostfakes::setZosTime(now);
    const size_t mark = hostfakes::callCount();
    const jint late = timerActive();
    return {late, hostfakes::callTextsSince(mark)};
}

using MmeTimerTest = LoadedCase;

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
    EXPECT_EQ(kUpcallLines, bridgeLines(log));
    // The start kept the runtime's callback, with no expiry time set.
    hostfakes::setZosTime(40);
    EXPECT_EQ(40, timerActive());
    EXPECT_EQ(std::vector<bool>{false}, gExpiries);
}

TEST_F(MmeTimerTest, EachUpcallRunsOnItsOwnAttachmentAndOutlivesAThrowingJava) {
    startBridge();
    setUpcallResult(4);
    std::set<std::string> threads;
    // First Java answers 4; then every upcall throws, which is cleared,
    // logged, and answered with 0.
    for (bool throwing : {false, true}) {
        setUpcallThrowing(throwing);
        for (const Upcall& upcall : kUpcalls) {
            EXPECT_EQ(throwing ? 0 : 4, upcall.fire()) << upcall.bridge;
            const std::string call = upcalls().back();
            EXPECT_THAT(call, onAttachedThread(upcall.java));
            threads.insert(threadOf(call));
            const std::string cleared = std::string(upcall.bridge) + ": Java exception cleared";
            EXPECT_EQ(throwing, log.contains(ANDROID_LOG_ERROR, "Mme_JNI", cleared)) << upcall.bridge;
        }
    }
    EXPECT_EQ(2 * kUpcalls.size(), threads.size());
    EXPECT_EQ(kUpcallLines + kUpcallLines, bridgeLines(log));

    // One engine thread making two upcalls in a row: the second still runs.
    clearUpcalls();
    onNativeThread([] { return android::JniZpandTimerInit() + android::JniZpandTimerDestroy(); });
    EXPECT_THAT(upcalls(),
                ElementsAre(onAttachedThread("zpandTimerInit()"), onAttachedThread("zpandTimerDestroy()")));
    // On a thread that stays attached, nothing is left pending, and the
    // thread stays attached (env() would throw otherwise).
    EXPECT_EQ(0, android::JniZpandTimerInit());
    EXPECT_FALSE(env()->ExceptionCheck());
    EXPECT_EQ("zpandTimerInit() on main", upcalls().back());
}

TEST_F(MmeTimerTest, JavaAnswersAPostDriveByDrivingTheMessages) {
    const size_t mark = hostfakes::callCount();
    EXPECT_EQ(0, mme("zpandModDriveMsg", "()I"));
    hostfakes::setResult("Zos_ModDriveMsg", -5);
    EXPECT_EQ(0, mme("zpandModDriveMsg", "()I"));
    EXPECT_EQ((V{"Zos_ModDriveMsg() = 0", "Zos_ModDriveMsg() = -5"}), hostfakes::callTextsSince(mark));
}

TEST_F(MmeTimerTest, TheExpiryReportCountsFromTheLastStart) {
    startBridge();
    hostfakes::setZosTime(100);
    ASSERT_EQ(0, hostfakes::fireZpandTimerStart(5000));
    EXPECT_THAT(upcalls(), ElementsAre(onAttachedThread("zpandTimerStart(5000)")));
    // Expiry at 105: late by 2, early by 1.
    EXPECT_EQ(std::make_pair(jint{2}, kExpired), reportAt(107));
    EXPECT_EQ(std::make_pair(jint{-1}, kExpired), reportAt(104));
    // Lengths count thousandths: 999 expires at once.
    ASSERT_EQ(0, hostfakes::fireZpandTimerStart(999));
    EXPECT_EQ(std::make_pair(jint{0}, kExpired), reportAt(104));
    // A stop forgets the expiry time but not the callback.
    hostfakes::fireZpandTimerStop();
    EXPECT_EQ(std::make_pair(jint{300}, kExpired), reportAt(300));
    // A length beyond 2^31 reaches Java as a positive long.
    hostfakes::setZosTime(10);
    hostfakes::fireZpandTimerStart(3000000000u);
    EXPECT_THAT(upcalls().back(), onAttachedThread("zpandTimerStart(3000000000)"));
    EXPECT_EQ(std::make_pair(jint{-3000000}, kExpired), reportAt(10));
}
