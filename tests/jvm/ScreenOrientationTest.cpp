// getScreenOrientation, the upcall other native components of the process
// make: which threads it attaches and detaches, what it answers, and what
// happens when the Java side throws. (Without a bound class: LoadHookTest.)
#include "JvmHarness.h"
#include "VceServiceJni.h"

using namespace jvmtest;

namespace {

constexpr const char* kCleared = "getScreenOrientation: Java exception cleared";

jint envState() {
    void* e = nullptr;
    return jvm()->GetEnv(&e, JNI_VERSION_1_4);
}

// Upcalls on one plain native thread: each answer, with whether the thread
// was still known to the JVM after it.
std::vector<std::pair<int, jint>> fromNativeThread(size_t calls) {
    return onNativeThread([calls] {
        std::vector<std::pair<int, jint>> out;
        while (out.size() < calls) out.emplace_back(getScreenOrientation(), envState());
        return out;
    });
}

using ScreenOrientationTest = LoadedCase;

}  // namespace

TEST_F(ScreenOrientationTest, OnlyAThreadTheJvmDoesNotKnowIsAttachedAndOnlyForOneCall) {
    setScreenOrientation(270);
    EXPECT_EQ(270, getScreenOrientation());
    EXPECT_EQ(JNI_OK, envState());
    // A thread its owner attached stays attached too.
    std::pair<int, jint> owner{-1, JNI_ERR};
    std::thread([&] {
        JavaVMAttachArgs args{JNI_VERSION_1_6, const_cast<char*>("camera-service"), nullptr};
        JNIEnv* e = nullptr;
        if (jvm()->AttachCurrentThread(&e, &args) != JNI_OK) return;
        owner = {getScreenOrientation(), envState()};
        jvm()->DetachCurrentThread();
    }).join();
    EXPECT_EQ(std::make_pair(270, JNI_OK), owner);
    EXPECT_EQ((V{"getScreenOrientation() on main", "getScreenOrientation() on camera-service"}), upcalls());

    // A plain native thread is attached for each call only: two calls on one
    // thread make a new attachment (a new Java thread) each.
    clearUpcalls();
    setScreenOrientation(-1);
    EXPECT_EQ((std::vector<std::pair<int, jint>>{{-1, JNI_EDETACHED}, {-1, JNI_EDETACHED}}),
              fromNativeThread(2));
    const V calls = upcalls();
    ASSERT_EQ(2u, calls.size());
    EXPECT_THAT(calls, ::testing::Each(onAttachedThread("getScreenOrientation()")));
    EXPECT_NE(threadOf(calls[0]), threadOf(calls[1]));
    EXPECT_TRUE(javaThreadAlive("main")) << "the check sees live threads";
}

TEST_F(ScreenOrientationTest, AJavaExceptionIsClearedAndLogged) {
    setScreenOrientation(3);
    setUpcallThrowing(true);
    // The answer of a method that threw is the JVM's 0, on a Java thread and
    // on a native one.
    EXPECT_EQ(0, getScreenOrientation());
    EXPECT_FALSE(env()->ExceptionCheck()) << "the upcall left its exception on the caller's thread";
    EXPECT_EQ((std::vector<std::pair<int, jint>>{{0, JNI_EDETACHED}}), fromNativeThread(1));
    EXPECT_EQ(2u, log.count(ANDROID_LOG_ERROR, "VCEService-JNI", kCleared));
    EXPECT_EQ(2u, upcalls().size());
    setUpcallThrowing(false);
    EXPECT_EQ(3, getScreenOrientation());
}
