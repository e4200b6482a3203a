// One embedded JVM per test process, running the Java stand-ins, with
// -Xcheck:jni. The classpath is the whole set of stand-ins unless the
// process asks for another before the first use.
//
// Everything the JVM prints goes through a hook, so a case can fail when
// -Xcheck:jni warned about a JNI call made while it ran.
#ifndef QUELLBORN_TESTS_JVMHARNESS_H
#define QUELLBORN_TESTS_JVMHARNESS_H

#include <binder/IBinder.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <jni.h>
#include <utils/StrongPointer.h>

#include <chrono>
#include <initializer_list>
#include <optional>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "LogCapture.h"
#include "Mvd.h"
#include "RemoteBinder.h"

namespace jvmtest {

constexpr const char* kMme = "com/tessaroval/vce/Mme";
constexpr const char* kVceService = "com/tessaroval/vce/VceService";
constexpr const char* kUpcallLog = "com/tessaroval/vce/UpcallLog";

// Picks the classpath of this process's JVM; only before the first jvm().
void useClassPath(const std::string& classPath);
bool vmCreated();

JavaVM* jvm();
// The environment of the calling thread (the thread must be attached).
JNIEnv* env();

// System.loadLibrary("quellborn"); returns the pending exception's class
// name ("" when it loaded) and clears it.
std::string loadLibrary();
// loadLibrary() once per process; later calls answer the first result.
std::string ensureLoaded();

// The message of the last exception takeException cleared.
std::string& lastMessage();

// Clears a pending exception and returns its class name ("" when none).
std::string takeException(JNIEnv* env);

// A local reference the caller owns; null (exception cleared) when missing.
jclass findClass(const char* name);

// Owns one local reference of the calling thread.
template <typename T>
class Local {
public:
    explicit Local(T ref = nullptr, JNIEnv* e = nullptr) : mRef(ref), mEnv(e != nullptr ? e : env()) {}
    ~Local() {
        if (mRef != nullptr) mEnv->DeleteLocalRef(mRef);
    }
    Local(Local&& other) noexcept : mRef(std::exchange(other.mRef, nullptr)), mEnv(other.mEnv) {}
    Local(const Local&) = delete;
    Local& operator=(const Local&) = delete;
    Local& operator=(Local&&) = delete;
    T get() const { return mRef; }
    operator T() const { return mRef; }

private:
    T mRef;
    JNIEnv* mEnv;
};

inline jvalue I(jint v) { jvalue j; j.i = v; return j; }
inline jvalue J(jlong v) { jvalue j; j.j = v; return j; }
inline jvalue L(jobject v) { jvalue j; j.l = v; return j; }

// Static calls by class, name and exact signature. An exception the call
// leaves pending is cleared and its class name stored in *thrown; without a
// place for it, the exception fails the case.
jint callInt(const char* cls, const char* name, const char* sig, std::vector<jvalue> args = {},
             std::string* thrown = nullptr);
jboolean callBool(const char* cls, const char* name, const char* sig, std::vector<jvalue> args = {});
// The returned string as UTF-16, nullopt when Java got null.
std::optional<std::u16string> callString(const char* cls, const char* name, const char* sig,
                                         std::vector<jvalue> args = {});
void callVoid(const char* cls, const char* name, const char* sig, std::vector<jvalue> args = {});

inline jint mme(const char* name, const char* sig, std::vector<jvalue> args = {},
                std::string* thrown = nullptr) {
    return callInt(kMme, name, sig, std::move(args), thrown);
}

Local<jstring> newString(const std::u16string& text);
std::u16string chars(jstring text);
std::string toString(JNIEnv* env, jstring text);
// A new android.content.Context.
Local<jobject> newContext(const char* name);
Local<jlongArray> newLongArray(jsize length, jlong fill);
std::vector<jlong> elements(jlongArray array);

// What the Java side recorded (UpcallLog: "name(args) on <thread>"), the
// thread named in one entry, and the switches of the stand-ins.
std::vector<std::string> upcalls();
void clearUpcalls();
std::string threadOf(const std::string& upcall);
// Matches the entry of `call` ("zpandTimerStart(5000)") made on a thread
// the upcall attached for itself, which the JVM names "Thread-<n>".
::testing::Matcher<std::string> onAttachedThread(const std::string& call);
void setUpcallResult(jint value);
void setUpcallThrowing(bool throwing);
void setScreenOrientation(jint value);
// Whether a live Java thread carries this name.
bool javaThreadAlive(const std::string& name);

// A video event record: word 0 the number, every other word n holds 100 + n,
// so a value taken from the wrong word shows.
tagMVD_EVNT mvdEvent(int number);

// The bridge's info lines (tag "Mme_JNI"), in order.
std::vector<std::string> bridgeLines(const LogCapture& log);

// new VceService().init(), with the modem pipe put in place first.
jint vceServiceInit();

// The service as a client process finds it, and one request to it (int32
// fields, then an optional binder); the reply's int32, -1000 - status on a
// failed transaction.
android::sp<android::IBinder> registeredService();
int32_t sendToService(uint32_t code, std::initializer_list<int32_t> ints = {},
                      const android::sp<android::IBinder>& binder = nullptr);

// What a client's binder received, one "code <c>: <int32> <int32> ..." each.
std::vector<std::string> received(const hostbinder::RemoteBinder& client);

// Runs fn on a new native thread, which no JVM knows, and returns its result.
template <typename Fn>
auto onNativeThread(Fn fn) -> decltype(fn()) {
    decltype(fn()) result{};
    std::thread t([&] { result = fn(); });
    t.join();
    return result;
}

// A virtual machine whose every function only counts the call and fails:
// code given it shows whether it touched the VM at all.
class UntouchableVm {
public:
    UntouchableVm();
    JavaVM* get() { return &mVm; }
    static int touches();

private:
    JavaVM mVm;
};

// Lines the JVM printed that report a JNI misuse (-Xcheck:jni warnings).
std::vector<std::string> jniWarnings();

template <typename Pred>
bool eventually(Pred pred, std::chrono::milliseconds timeout = std::chrono::seconds(5)) {
    const auto deadline = std::chrono::steady_clock::now() + timeout;
    while (!pred()) {
        if (std::chrono::steady_clock::now() >= deadline) return false;
        std::this_thread::sleep_for(std::chrono::milliseconds(2));
    }
    return true;
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

private:
    size_t mWarningMark = 0;
};

}  // namespace jvmtest

// For cases about process-wide first states (a JVM with another classpath,
// natives before sysInit): skipped when an earlier case shares the process.
#define JVM_REQUIRE_FRESH_PROCESS()                                                          \
    if (!firstInProcess())                                                                   \
    GTEST_SKIP() << "needs a process of its own; run it alone (ctest runs each case alone)"

#endif  // QUELLBORN_TESTS_JVMHARNESS_H
