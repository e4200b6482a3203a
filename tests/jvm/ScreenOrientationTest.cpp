// getScreenOrientation, the upcall other native components of the process
// make: which threads it attaches and detaches, what it answers, and what
// happens when the Java side throws or is missing.
#include <android/log.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <thread>
#include <vector>

#include "JvmHarness.h"
#include "VceServiceJni.h"

using namespace jvmtest;

namespace {

constexpr const char* kJniTag = "VCEService-JNI";
constexpr const char* kCleared = "getScreenOrientation: Java exception cleared";

jint envState() {
    void* e = nullptr;
    return jvm()->GetEnv(&e, JNI_VERSION_1_4);
}

struct NativeCall {
    int orientation = 0;
    jint envAfter = JNI_OK;
};

// One upcall from a plain native thread, and whether the thread is still
// known to the JVM afterwards.
NativeCall fromNativeThread() {
    return onNativeThread([] { return NativeCall{getScreenOrientation(), envState()}; });
}

class ScreenOrientationTest : public JvmCase {
protected:
    void SetUp() override {
        JvmCase::SetUp();
        load();
    }
};

}  // namespace

TEST_F(ScreenOrientationTest, AJavaThreadIsNeitherAttachedNorDetached) {
    setScreenOrientation(270);
    EXPECT_EQ(270, getScreenOrientation());
    EXPECT_EQ(std::vector<std::string>{"getScreenOrientation() on main"}, upcalls());
    EXPECT_EQ(JNI_OK, envState());
    EXPECT_FALSE(env()->ExceptionCheck());
}

TEST_F(ScreenOrientationTest, AThreadAttachedByItsOwnerStaysAttached) {
    setScreenOrientation(2);
    struct Seen {
        int orientation = -1;
        jint envAfter = JNI_ERR;
    } seen;
    std::thread owner([&] {
        JavaVMAttachArgs args{JNI_VERSION_1_6, const_cast<char*>("camera-service"), nullptr};
        JNIEnv* e = nullptr;
        if (jvm()->AttachCurrentThread(&e, &args) != JNI_OK) return;
        seen.orientation = getScreenOrientation();
        seen.envAfter = envState();
        jvm()->DetachCurrentThread();
    });
    owner.join();
    EXPECT_EQ(2, seen.orientation);
    EXPECT_EQ(JNI_OK, seen.envAfter);
    EXPECT_EQ(std::vector<std::string>{"getScreenOrientation() on camera-service"}, upcalls());
}

TEST_F(ScreenOrientationTest, APlainNativeThreadIsAttachedForEachCallOnly) {
    setScreenOrientation(-1);
    const NativeCall first = fromNativeThread();
    EXPECT_EQ(-1, first.orientation);
    EXPECT_EQ(JNI_EDETACHED, first.envAfter);

    // Two calls on one thread: a new attachment (a new Java thread) for each.
    std::vector<int> answers;
    std::vector<jint> states;
    std::thread repeated([&] {
        for (int i = 0; i < 2; ++i) {
            answers.push_back(getScreenOrientation());
            states.push_back(envState());
        }
    });
    repeated.join();
    EXPECT_EQ((std::vector<int>{-1, -1}), answers);
    EXPECT_EQ((std::vector<jint>{JNI_EDETACHED, JNI_EDETACHED}), states);

    const std::vector<std::string> calls = upcalls();
    ASSERT_EQ(3u, calls.size());
    for (const std::string& call : calls) {
        EXPECT_THAT(call, onAttachedThread("getScreenOrientation()"));
        EXPECT_FALSE(javaThreadAlive(threadOf(call))) << call;
    }
    EXPECT_NE(threadOf(calls[1]), threadOf(calls[2]));
}

TEST_F(ScreenOrientationTest, AJavaExceptionIsClearedAndLogged) {
    setScreenOrientation(3);
    setUpcallThrowing(true);
    // The answer of a method that threw is the JVM's 0.
    EXPECT_EQ(0, getScreenOrientation());
    EXPECT_FALSE(env()->ExceptionCheck()) << "the upcall left its exception on the caller's thread";
    EXPECT_EQ(1u, log.count(ANDROID_LOG_ERROR, kJniTag, kCleared));

    const NativeCall native = fromNativeThread();
    EXPECT_EQ(0, native.orientation);
    EXPECT_EQ(JNI_EDETACHED, native.envAfter);
    EXPECT_EQ(2u, log.count(ANDROID_LOG_ERROR, kJniTag, kCleared));
    EXPECT_EQ(2u, upcalls().size());

    setUpcallThrowing(false);
    EXPECT_EQ(3, getScreenOrientation());
}

TEST_F(ScreenOrientationTest, WithoutTheClassTheAnswerIsZeroAndTheVmIsNotTouched) {
    // The state a failed load hook leaves behind: no class reference.
    jclass const bound = clazz;
    JavaVM* const real = vce_jvm;
    UntouchableVm untouchable;
    clazz = nullptr;
    vce_jvm = untouchable.get();
    const int onMain = getScreenOrientation();
    const int onNative = onNativeThread([] { return getScreenOrientation(); });
    vce_jvm = real;
    clazz = bound;
    EXPECT_EQ(0, onMain);
    EXPECT_EQ(0, onNative);
    EXPECT_EQ(0, UntouchableVm::touches());
    EXPECT_TRUE(upcalls().empty());
}
