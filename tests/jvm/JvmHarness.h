// One embedded JVM per test process, running the Java stand-ins, with
// -Xcheck:jni. The classpath is the whole set of stand-ins unless the
// process asks for another before the first use.
//
// Everything the JVM prints goes through a hook, so a case can fail when
// -Xcheck:jni warned about a JNI call made while it ran.
#ifndef QUELLBORN_TESTS_JVMHARNESS_H
#define QUELLBORN_TESTS_JVMHARNESS_H

#include <android/log.h>
#include <binder/IBinder.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <jni.h>
#include <utils/StrongPointer.h>

#include <initializer_list>
#include <memory>
#include <optional>
#include <string>
#include <thread>
#include <type_traits>
#include <utility>
#include <vector>

#include "EngineHarness.h"
#include "Eventually.h"
#include "HostFakes.h"
#include "LogCapture.h"
#include "Mvd.h"
#include "RemoteBinder.h"

namespace jvmtest {

using enginetest::inOrder;
using enginetest::received;

// Texts in order (calls, log lines, upcalls), and two such lists joined.
using V = std::vector<std::string>;
inline V operator+(V a, const V& b) {
    a.insert(a.end(), b.begin(), b.end());
    return a;
}

constexpr const char* kMme = "com/tessaroval/vce/Mme";
constexpr const char* kVceService = "com/tessaroval/vce/VceService";
constexpr const char* kUpcallLog = "com/tessaroval/vce/UpcallLog";

// Picks the classpath of this process's JVM; only before the first jvm().
void useClassPath(const std::string& classPath);
JavaVM* jvm();
// The environment of the calling thread (the thread must be attached).
JNIEnv* env();

// System.loadLibrary("quellborn"); returns the pending exception's class
// name ("" when it loaded) and clears it. lastMessage() is its message.
std::string loadLibrary();
std::string& lastMessage();

// A local reference the caller owns; null (exception cleared) when missing.
jclass findClass(const char* name);

// Owns one local reference of the calling thread.
struct LocalDelete {
    void operator()(jobject ref) const { env()->DeleteLocalRef(ref); }
};
template <typename T>
struct Local : std::unique_ptr<std::remove_pointer_t<T>, LocalDelete> {
    using std::unique_ptr<std::remove_pointer_t<T>, LocalDelete>::unique_ptr;
    operator T() const { return this->get(); }
};

inline jvalue I(jint v) { jvalue j; j.i = v; return j; }
inline jvalue J(jlong v) { jvalue j; j.j = v; return j; }
inline jvalue L(jobject v) { jvalue j; j.l = v; return j; }
inline jvalue Z(bool v) { jvalue j; j.z = v ? JNI_TRUE : JNI_FALSE; return j; }

// A static call by class, name and exact signature; the answer is in the
// member the signature's return type names (a returned object is a local
// reference the caller owns). An exception the call leaves pending is
// cleared and its class name stored in *thrown; without a place for it, the
// exception fails the case.
jvalue callStatic(const char* cls, const char* name, const char* sig, std::vector<jvalue> args = {},
                  std::string* thrown = nullptr);
inline jint mme(const char* name, const char* sig, std::vector<jvalue> args = {},
                std::string* thrown = nullptr) {
    return callStatic(kMme, name, sig, std::move(args), thrown).i;
}
// An Mme native answering a String, as UTF-16; nullopt when Java got null.
std::optional<std::u16string> mmeString(const char* name, const char* sig, std::vector<jvalue> args = {});

Local<jstring> newString(const std::u16string& text);
// new <cls>(args) by the constructor's exact signature.
Local<jobject> newObject(const char* cls, const char* ctorSig, std::vector<jvalue> args = {});
Local<jlongArray> newLongArray(jsize length, jlong fill);
std::vector<jlong> elements(jlongArray array);
// Mme.captureStatistics (which must answer 0) into a new array of 16.
std::vector<jlong> captureStatistics(jlong stream);

// What the Java side recorded (UpcallLog: "name(args) on <thread>"), the
// thread named in one entry, and the switches of the stand-ins.
V upcalls();
inline void clearUpcalls() { callStatic(kUpcallLog, "clear", "()V"); }
inline std::string threadOf(const std::string& upcall) { return upcall.substr(upcall.rfind(" on ") + 4); }
// Matches the entry of `call` ("zpandTimerStart(5000)") made on a thread
// the upcall attached for itself (the JVM names it "Thread-<n>") and has
// detached again (no live Java thread has its name).
::testing::Matcher<std::string> onAttachedThread(const std::string& call);
inline void setUpcallResult(jint value) { callStatic(kUpcallLog, "setResult", "(I)V", {I(value)}); }
inline void setUpcallThrowing(bool throwing) { callStatic(kUpcallLog, "setThrowing", "(Z)V", {Z(throwing)}); }
inline void setScreenOrientation(jint value) {
    callStatic(kVceService, "setScreenOrientation", "(I)V", {I(value)});
}
// Whether a live Java thread carries this name.
bool javaThreadAlive(const std::string& name);

// A video event record: word 0 the number, every other word n holds 100 + n,
// so a value taken from the wrong word shows.
tagMVD_EVNT mvdEvent(int number);

// The bridge's info lines (tag "Mme_JNI"), in order.
V bridgeLines(const LogCapture& log);

// new VceService().init(), with the modem pipe put in place first.
jint vceServiceInit();

// The service as a client process finds it, and one request to it (int32
// fields, then an optional binder); the reply's int32, -1000 - status on a
// failed transaction.
android::sp<android::IBinder> registeredService();
int32_t sendToService(uint32_t code, std::initializer_list<int32_t> ints = {},
                      const android::sp<android::IBinder>& binder = nullptr);

// Runs fn on a new native thread, which no JVM knows, and returns its result.
template <typename Fn>
auto onNativeThread(Fn fn) -> decltype(fn()) {
    decltype(fn()) result{};
    std::thread t([&] { result = fn(); });
    t.join();
    return result;
}

// Base of every JVM case: a fresh call record and log, and at the end no
// exception left pending on the main thread and no -Xcheck:jni warning.
class JvmCase : public ::testing::Test {
protected:
    void SetUp() override;
    void TearDown() override;
    // True when no other case ran before this one in the process: the JVM,
    // the library and the bridge's process-wide state are untouched. CTest
    // runs each case in a process of its own.
    static bool firstInProcess();
    // Loads the library into the JVM (whole classpath) or fails the case.
    static void load();

    LogCapture log;
};

// A JvmCase that loads the library first.
class LoadedCase : public JvmCase {
protected:
    void SetUp() override {
        JvmCase::SetUp();
        load();
    }
    // sysInit installs the bridge; the log starts after it.
    void startBridge() {
        ASSERT_EQ(0, mme("sysInit", "()I"));
        log.clear();
    }
};

}  // namespace jvmtest

// For cases about process-wide first states (a JVM with another classpath,
// natives before sysInit): skipped when an earlier case shares the process.
#define JVM_REQUIRE_FRESH_PROCESS()                                                          \
    if (!firstInProcess())                                                                   \
    GTEST_SKIP() << "needs a process of its own; run it alone (ctest runs each case alone)"

#endif  // QUELLBORN_TESTS_JVMHARNESS_H
