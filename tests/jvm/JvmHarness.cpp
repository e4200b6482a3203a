#include "JvmHarness.h"

#include <android/log.h>
#include <binder/IServiceManager.h>
#include <binder/Parcel.h>
#include <utils/String16.h>

#include <atomic>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <mutex>
#include <stdexcept>

#include "EngineHarness.h"
#include "HostFakes.h"

namespace jvmtest {

namespace {

std::string gClassPath = QUELLBORN_JAVA_CLASSES;
JavaVM* gVm = nullptr;
std::once_flag gOnce;
int gCases = 0;

// What the JVM prints: passed on to stderr, and kept line by line so the
// cases can look for -Xcheck:jni's complaints.
std::mutex gOutputLock;
std::string gPartialLine;
std::vector<std::string> gWarnings;

jint JNICALL captureOutput(FILE* stream, const char* format, va_list args) {
    char buffer[4096];
    va_list copy;
    va_copy(copy, args);
    const int n = vsnprintf(buffer, sizeof(buffer), format, copy);
    va_end(copy);
    if (n < 0) return n;
    fputs(buffer, stream == stdout ? stdout : stderr);
    std::lock_guard<std::mutex> lock(gOutputLock);
    gPartialLine += buffer;
    size_t end;
    while ((end = gPartialLine.find('\n')) != std::string::npos) {
        const std::string line = gPartialLine.substr(0, end);
        gPartialLine.erase(0, end + 1);
        if (line.find("WARNING") != std::string::npos || line.find("Warning") != std::string::npos ||
            line.find("FATAL ERROR") != std::string::npos) {
            gWarnings.push_back(line);
        }
    }
    return n;
}

void createVm() {
    std::string classPath = "-Djava.class.path=" + gClassPath;
    std::string libraryPath = std::string("-Djava.library.path=") + QUELLBORN_LIBRARY_DIR;
    // HotSpot's crash files stay out of the tree.
    std::string errorFile = "-XX:ErrorFile=/tmp/quellborn-hs_err_%p.log";
    JavaVMOption options[] = {
            {const_cast<char*>(classPath.c_str()), nullptr},
            {const_cast<char*>(libraryPath.c_str()), nullptr},
            {const_cast<char*>("-Xcheck:jni"), nullptr},
            {const_cast<char*>(errorFile.c_str()), nullptr},
            {const_cast<char*>("vfprintf"), reinterpret_cast<void*>(captureOutput)},
    };
    JavaVMInitArgs args{};
    args.version = JNI_VERSION_1_6;
    args.nOptions = sizeof(options) / sizeof(options[0]);
    args.options = options;
    args.ignoreUnrecognized = JNI_FALSE;
    JNIEnv* env = nullptr;
    if (JNI_CreateJavaVM(&gVm, &env, &args) != JNI_OK) throw std::runtime_error("JNI_CreateJavaVM failed");
}

// Clears what a call left pending; a failure of the case unless the caller
// takes the exception.
void settle(JNIEnv* e, const char* what, std::string* thrown) {
    const std::string exception = takeException(e);
    if (thrown != nullptr) {
        *thrown = exception;
    } else if (!exception.empty()) {
        ADD_FAILURE() << what << " threw " << exception << ": " << lastMessage();
    }
}

struct StaticMethod {
    Local<jclass> cls;
    jmethodID id = nullptr;
};

StaticMethod staticMethod(const char* cls, const char* name, const char* sig) {
    StaticMethod m{Local<jclass>(findClass(cls)), nullptr};
    if (m.cls.get() == nullptr) {
        ADD_FAILURE() << "no class " << cls;
        return m;
    }
    m.id = env()->GetStaticMethodID(m.cls, name, sig);
    if (m.id == nullptr) ADD_FAILURE() << "no method " << name << sig << ": " << takeException(env());
    return m;
}

}  // namespace

std::string& lastMessage() {
    static std::string message;
    return message;
}

void useClassPath(const std::string& classPath) { gClassPath = classPath; }

bool vmCreated() { return gVm != nullptr; }

JavaVM* jvm() {
    std::call_once(gOnce, createVm);
    return gVm;
}

JNIEnv* env() {
    void* e = nullptr;
    if (jvm()->GetEnv(&e, JNI_VERSION_1_6) != JNI_OK) throw std::runtime_error("thread not attached");
    return static_cast<JNIEnv*>(e);
}

std::string takeException(JNIEnv* e) {
    jthrowable thrown = e->ExceptionOccurred();
    if (thrown == nullptr) return "";
    e->ExceptionClear();
    // Class.getName and Throwable.getMessage do not throw; the checks are
    // what -Xcheck:jni asks for after every call into Java.
    jclass cls = e->GetObjectClass(thrown);
    jclass classClass = e->FindClass("java/lang/Class");
    jmethodID getName = e->GetMethodID(classClass, "getName", "()Ljava/lang/String;");
    auto name = static_cast<jstring>(e->CallObjectMethod(cls, getName));
    if (e->ExceptionCheck()) e->ExceptionClear();
    std::string out = toString(e, name);
    jclass throwableClass = e->FindClass("java/lang/Throwable");
    jmethodID getMessage = e->GetMethodID(throwableClass, "getMessage", "()Ljava/lang/String;");
    auto message = static_cast<jstring>(e->CallObjectMethod(thrown, getMessage));
    if (e->ExceptionCheck()) e->ExceptionClear();
    lastMessage() = message != nullptr ? toString(e, message) : "";
    if (message != nullptr) e->DeleteLocalRef(message);
    e->DeleteLocalRef(throwableClass);
    e->DeleteLocalRef(name);
    e->DeleteLocalRef(classClass);
    e->DeleteLocalRef(cls);
    e->DeleteLocalRef(thrown);
    return out;
}

std::string loadLibrary() {
    JNIEnv* e = env();
    jclass loader = e->FindClass("com/tessaroval/vce/NativeLoader");
    if (loader == nullptr) return takeException(e);
    e->CallStaticVoidMethod(loader, e->GetStaticMethodID(loader, "load", "()V"));
    e->DeleteLocalRef(loader);
    return takeException(e);
}

std::string ensureLoaded() {
    static const std::string result = loadLibrary();
    return result;
}

jclass findClass(const char* name) {
    JNIEnv* e = env();
    jclass cls = e->FindClass(name);
    if (cls == nullptr) takeException(e);
    return cls;
}

jint callInt(const char* cls, const char* name, const char* sig, std::vector<jvalue> args,
             std::string* thrown) {
    StaticMethod m = staticMethod(cls, name, sig);
    if (m.id == nullptr) return 0;
    const jint result = env()->CallStaticIntMethodA(m.cls, m.id, args.data());
    settle(env(), name, thrown);
    return result;
}

jboolean callBool(const char* cls, const char* name, const char* sig, std::vector<jvalue> args) {
    StaticMethod m = staticMethod(cls, name, sig);
    if (m.id == nullptr) return JNI_FALSE;
    const jboolean result = env()->CallStaticBooleanMethodA(m.cls, m.id, args.data());
    settle(env(), name, nullptr);
    return result;
}

std::optional<std::u16string> callString(const char* cls, const char* name, const char* sig,
                                         std::vector<jvalue> args) {
    StaticMethod m = staticMethod(cls, name, sig);
    if (m.id == nullptr) return std::nullopt;
    Local<jstring> result(static_cast<jstring>(env()->CallStaticObjectMethodA(m.cls, m.id, args.data())));
    settle(env(), name, nullptr);
    if (result.get() == nullptr) return std::nullopt;
    return chars(result);
}

void callVoid(const char* cls, const char* name, const char* sig, std::vector<jvalue> args) {
    StaticMethod m = staticMethod(cls, name, sig);
    if (m.id == nullptr) return;
    env()->CallStaticVoidMethodA(m.cls, m.id, args.data());
    settle(env(), name, nullptr);
}

Local<jstring> newString(const std::u16string& text) {
    return Local<jstring>(
            env()->NewString(reinterpret_cast<const jchar*>(text.data()), static_cast<jsize>(text.size())));
}

std::u16string chars(jstring text) {
    JNIEnv* e = env();
    std::u16string out(static_cast<size_t>(e->GetStringLength(text)), u'\0');
    e->GetStringRegion(text, 0, static_cast<jsize>(out.size()), reinterpret_cast<jchar*>(out.data()));
    return out;
}

std::string toString(JNIEnv* e, jstring text) {
    if (text == nullptr) return "<null>";
    const char* utf = e->GetStringUTFChars(text, nullptr);
    std::string out = utf != nullptr ? utf : "";
    e->ReleaseStringUTFChars(text, utf);
    return out;
}

Local<jobject> newContext(const char* name) {
    JNIEnv* e = env();
    Local<jclass> cls(findClass("android/content/Context"));
    Local<jstring> text(e->NewStringUTF(name));
    jmethodID ctor = e->GetMethodID(cls, "<init>", "(Ljava/lang/String;)V");
    Local<jobject> context(e->NewObject(cls, ctor, text.get()));
    settle(e, "new Context", nullptr);
    return context;
}

Local<jlongArray> newLongArray(jsize length, jlong fill) {
    JNIEnv* e = env();
    Local<jlongArray> array(e->NewLongArray(length));
    const std::vector<jlong> values(static_cast<size_t>(length), fill);
    e->SetLongArrayRegion(array, 0, length, values.data());
    return array;
}

std::vector<jlong> elements(jlongArray array) {
    JNIEnv* e = env();
    std::vector<jlong> out(static_cast<size_t>(e->GetArrayLength(array)));
    e->GetLongArrayRegion(array, 0, static_cast<jsize>(out.size()), out.data());
    return out;
}

std::vector<std::string> upcalls() {
    JNIEnv* e = env();
    StaticMethod m = staticMethod(kUpcallLog, "callArray", "()[Ljava/lang/String;");
    Local<jobjectArray> array(static_cast<jobjectArray>(e->CallStaticObjectMethod(m.cls, m.id)));
    settle(e, "UpcallLog.callArray", nullptr);
    std::vector<std::string> out;
    const jsize n = array.get() != nullptr ? e->GetArrayLength(array) : 0;
    for (jsize i = 0; i < n; ++i) {
        Local<jstring> item(static_cast<jstring>(e->GetObjectArrayElement(array, i)));
        out.push_back(toString(e, item));
    }
    return out;
}

void clearUpcalls() { callVoid(kUpcallLog, "clear", "()V"); }

std::string threadOf(const std::string& upcall) {
    const size_t at = upcall.rfind(" on ");
    return at == std::string::npos ? "" : upcall.substr(at + 4);
}

::testing::Matcher<std::string> onAttachedThread(const std::string& call) {
    std::string escaped;
    for (char c : call) {
        if (std::string("()[]{}.*+?^$|\\").find(c) != std::string::npos) escaped += '\\';
        escaped += c;
    }
    return ::testing::MatchesRegex(escaped + " on Thread-[0-9]+");
}

void setUpcallResult(jint value) { callVoid(kUpcallLog, "setResult", "(I)V", {I(value)}); }

void setUpcallThrowing(bool throwing) {
    jvalue v;
    v.z = throwing ? JNI_TRUE : JNI_FALSE;
    callVoid(kUpcallLog, "setThrowing", "(Z)V", {v});
}

void setScreenOrientation(jint value) {
    callVoid(kVceService, "setScreenOrientation", "(I)V", {I(value)});
}

bool javaThreadAlive(const std::string& name) {
    JNIEnv* e = env();
    Local<jclass> threadClass(findClass("java/lang/Thread"));
    Local<jclass> mapClass(findClass("java/util/Map"));
    Local<jclass> setClass(findClass("java/util/Set"));
    jmethodID all = e->GetStaticMethodID(threadClass, "getAllStackTraces", "()Ljava/util/Map;");
    jmethodID keySet = e->GetMethodID(mapClass, "keySet", "()Ljava/util/Set;");
    jmethodID toArray = e->GetMethodID(setClass, "toArray", "()[Ljava/lang/Object;");
    jmethodID getName = e->GetMethodID(threadClass, "getName", "()Ljava/lang/String;");
    jmethodID isAlive = e->GetMethodID(threadClass, "isAlive", "()Z");
    Local<jobject> map(e->CallStaticObjectMethod(threadClass, all));
    settle(e, "Thread.getAllStackTraces", nullptr);
    Local<jobject> threads(e->CallObjectMethod(map, keySet));
    settle(e, "Map.keySet", nullptr);
    Local<jobjectArray> array(static_cast<jobjectArray>(e->CallObjectMethod(threads, toArray)));
    settle(e, "Set.toArray", nullptr);
    bool alive = false;
    for (jsize i = 0; i < e->GetArrayLength(array) && !alive; ++i) {
        Local<jobject> thread(e->GetObjectArrayElement(array, i));
        Local<jstring> threadName(static_cast<jstring>(e->CallObjectMethod(thread, getName)));
        settle(e, "Thread.getName", nullptr);
        alive = toString(e, threadName) == name && e->CallBooleanMethod(thread, isAlive);
        settle(e, "Thread.isAlive", nullptr);
    }
    return alive;
}

tagMVD_EVNT mvdEvent(int number) {
    tagMVD_EVNT event{};
    event.aiWord[0] = number;
    for (int i = 1; i < MVD_EVNT_WORDS; ++i) event.aiWord[i] = 100 + i;
    return event;
}

std::vector<std::string> bridgeLines(const LogCapture& log) {
    std::vector<std::string> out;
    for (const LogLine& line : log.linesWithTag("Mme_JNI")) {
        if (line.priority == ANDROID_LOG_INFO) out.push_back(line.text);
    }
    return out;
}

jint vceServiceInit() {
    enginetest::modem();
    JNIEnv* e = env();
    Local<jclass> cls(findClass(kVceService));
    if (cls.get() == nullptr) {
        ADD_FAILURE() << "no class " << kVceService;
        return 0;
    }
    Local<jobject> service(e->NewObject(cls, e->GetMethodID(cls, "<init>", "()V")));
    settle(e, "new VceService", nullptr);
    const jint result = e->CallIntMethod(service, e->GetMethodID(cls, "init", "()I"));
    settle(e, "VceService.init", nullptr);
    return result;
}

android::sp<android::IBinder> registeredService() {
    return android::defaultServiceManager()->checkService(android::String16("VideoCallEngineService"));
}

int32_t sendToService(uint32_t code, std::initializer_list<int32_t> ints,
                      const android::sp<android::IBinder>& binder) {
    android::sp<android::IBinder> service = registeredService();
    if (service == nullptr) {
        ADD_FAILURE() << "no VideoCallEngineService registered";
        return -1;
    }
    android::Parcel request;
    android::Parcel reply;
    for (int32_t v : ints) request.writeInt32(v);
    if (binder != nullptr) request.writeStrongBinder(binder);
    const android::status_t status = service->transact(code, request, &reply);
    if (status != android::NO_ERROR) return -1000 - status;
    reply.setDataPosition(0);
    return reply.readInt32();
}

namespace {

std::atomic<int> gTouches{0};
jint touchDestroy(JavaVM*) { return ++gTouches, JNI_ERR; }
jint touchAttach(JavaVM*, JNIEnv**, void*) { return ++gTouches, JNI_ERR; }
jint touchDetach(JavaVM*) { return ++gTouches, JNI_ERR; }
jint touchGetEnv(JavaVM*, void**, jint) { return ++gTouches, JNI_ERR; }
const JNIInvokeInterface kUntouchable = {nullptr,     nullptr,     nullptr,    touchDestroy,
                                         touchAttach, touchDetach, touchGetEnv, touchAttach};

}  // namespace

UntouchableVm::UntouchableVm() { mVm.functions = &kUntouchable; }

int UntouchableVm::touches() { return gTouches.load(); }

std::vector<std::string> received(const hostbinder::RemoteBinder& client) {
    std::vector<std::string> out;
    for (const hostbinder::RemoteBinder::Transaction& t : client.transactions()) {
        std::string text = "code " + std::to_string(t.code) + ":";
        for (size_t at = 0; at + sizeof(int32_t) <= t.data.size(); at += sizeof(int32_t)) {
            int32_t v;
            memcpy(&v, t.data.data() + at, sizeof(v));
            text += " " + std::to_string(v);
        }
        out.push_back(text);
    }
    return out;
}

std::vector<std::string> jniWarnings() {
    std::lock_guard<std::mutex> lock(gOutputLock);
    return gWarnings;
}

void JvmCase::SetUp() {
    ++gCases;
    hostfakes::reset();
    log.clear();
    mWarningMark = jniWarnings().size();
}

void JvmCase::TearDown() {
    if (!vmCreated()) return;
    JNIEnv* e = env();
    EXPECT_FALSE(e->ExceptionCheck()) << "an exception is left pending on the main thread";
    e->ExceptionClear();
    const std::vector<std::string> warnings = jniWarnings();
    const std::vector<std::string> fresh(warnings.begin() + static_cast<std::ptrdiff_t>(mWarningMark),
                                         warnings.end());
    EXPECT_EQ(std::vector<std::string>{}, fresh) << "the JVM warned about JNI use";
    // The next case in this process starts with quiet stand-ins.
    Local<jclass> log(findClass(kUpcallLog));
    if (log.get() != nullptr) {
        setUpcallThrowing(false);
        setUpcallResult(0);
        clearUpcalls();
    }
}

bool JvmCase::firstInProcess() { return gCases == 1; }

void JvmCase::load() { ASSERT_EQ("", ensureLoaded()) << lastMessage(); }

}  // namespace jvmtest
