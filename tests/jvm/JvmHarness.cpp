#include "JvmHarness.h"

#include <binder/IServiceManager.h>
#include <binder/Parcel.h>
#include <utils/String16.h>

#include <cstdarg>
#include <cstdio>
#include <cstring>
#include <iterator>
#include <mutex>
#include <stdexcept>


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
V gWarnings;

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
    for (size_t end; (end = gPartialLine.find('\n')) != std::string::npos; gPartialLine.erase(0, end + 1)) {
        const std::string line = gPartialLine.substr(0, end);
        if (line.find("WARNING") != std::string::npos || line.find("Warning") != std::string::npos ||
            line.find("FATAL ERROR") != std::string::npos) {
            gWarnings.push_back(line);
        }
    }
    return n;
}

void createVm() {
    const std::string classPath = "-Djava.class.path=" + gClassPath;
    const std::string libraryPath = std::string("-Djava.library.path=") + QUELLBORN_LIBRARY_DIR;
    // HotSpot's crash files stay out of the tree.
    JavaVMOption options[] = {
            {const_cast<char*>(classPath.c_str()), nullptr},
            {const_cast<char*>(libraryPath.c_str()), nullptr},
            {const_cast<char*>("-Xcheck:jni"), nullptr},
            {const_cast<char*>("-XX:ErrorFile=/tmp/quellborn-hs_err_%p.log"), nullptr},
            {const_cast<char*>("vfprintf"), reinterpret_cast<void*>(captureOutput)},
    };
    JavaVMInitArgs args{JNI_VERSION_1_6, static_cast<jint>(std::size(options)), options, JNI_FALSE};
    JNIEnv* e = nullptr;
    if (JNI_CreateJavaVM(&gVm, &e, &args) != JNI_OK) throw std::runtime_error("JNI_CreateJavaVM failed");
}

std::string toString(jstring text) {
    if (text == nullptr) return "<null>";
    const char* utf = env()->GetStringUTFChars(text, nullptr);
    std::string out = utf != nullptr ? utf : "";
    env()->ReleaseStringUTFChars(text, utf);
    return out;
}

// String.valueOf(object), which neither throws nor needs an instance call.
std::string describe(jobject object) {
    constexpr const char* kValueOf = "(Ljava/lang/Object;)Ljava/lang/String;";
    const jvalue text = callStatic("java/lang/String", "valueOf", kValueOf, {L(object)});
    return toString(Local<jstring>(static_cast<jstring>(text.l)));
}

// Clears a pending exception and returns its class name ("" when none);
// its message goes to lastMessage().
std::string takeException() {
    JNIEnv* e = env();
    Local<jthrowable> thrown(e->ExceptionOccurred());
    if (thrown.get() == nullptr) return "";
    e->ExceptionClear();
    // Throwable.toString: "<class name>" or "<class name>: <message>".
    const std::string text = describe(thrown);
    const size_t colon = text.find(": ");
    lastMessage() = colon == std::string::npos ? "" : text.substr(colon + 2);
    return text.substr(0, colon);
}

// Clears what a call left pending; a failure of the case unless the caller
// takes the exception.
void settle(const char* what, std::string* thrown = nullptr) {
    const std::string exception = takeException();
    if (thrown != nullptr) {
        *thrown = exception;
    } else if (!exception.empty()) {
        ADD_FAILURE() << what << " threw " << exception << ": " << lastMessage();
    }
}

}  // namespace

std::string& lastMessage() {
    static std::string message;
    return message;
}

void useClassPath(const std::string& classPath) { gClassPath = classPath; }

JavaVM* jvm() {
    std::call_once(gOnce, createVm);
    return gVm;
}

JNIEnv* env() {
    void* e = nullptr;
    if (jvm()->GetEnv(&e, JNI_VERSION_1_6) != JNI_OK) throw std::runtime_error("thread not attached");
    return static_cast<JNIEnv*>(e);
}

std::string loadLibrary() {
    std::string thrown;
    callStatic("com/tessaroval/vce/NativeLoader", "load", "()V", {}, &thrown);
    return thrown;
}

jclass findClass(const char* name) {
    jclass cls = env()->FindClass(name);
    if (cls == nullptr) takeException();
    return cls;
}

jvalue callStatic(const char* cls, const char* name, const char* sig, std::vector<jvalue> args,
                  std::string* thrown) {
    JNIEnv* e = env();
    jvalue out{};
    Local<jclass> c(findClass(cls));
    jmethodID id = c.get() != nullptr ? e->GetStaticMethodID(c, name, sig) : nullptr;
    if (id == nullptr) {
        ADD_FAILURE() << "no method " << cls << "." << name << sig << ": " << takeException();
        return out;
    }
    switch (strchr(sig, ')')[1]) {
        case 'I': out.i = e->CallStaticIntMethodA(c, id, args.data()); break;
        case 'Z': out.z = e->CallStaticBooleanMethodA(c, id, args.data()); break;
        case 'V': e->CallStaticVoidMethodA(c, id, args.data()); break;
        default: out.l = e->CallStaticObjectMethodA(c, id, args.data());
    }
    settle(name, thrown);
    return out;
}

std::optional<std::u16string> mmeString(const char* name, const char* sig, std::vector<jvalue> args) {
    Local<jstring> text(static_cast<jstring>(callStatic(kMme, name, sig, std::move(args)).l));
    if (text.get() == nullptr) return std::nullopt;
    std::u16string out(static_cast<size_t>(env()->GetStringLength(text)), u'\0');
    env()->GetStringRegion(text, 0, static_cast<jsize>(out.size()), reinterpret_cast<jchar*>(out.data()));
    return out;
}

Local<jstring> newString(const std::u16string& text) {
    return Local<jstring>(
            env()->NewString(reinterpret_cast<const jchar*>(text.data()), static_cast<jsize>(text.size())));
}

Local<jobject> newObject(const char* cls, const char* ctorSig, std::vector<jvalue> args) {
    Local<jclass> c(findClass(cls));
    Local<jobject> object(env()->NewObjectA(c, env()->GetMethodID(c, "<init>", ctorSig), args.data()));
    settle(cls);
    return object;
}

Local<jlongArray> newLongArray(jsize length, jlong fill) {
    Local<jlongArray> array(env()->NewLongArray(length));
    const std::vector<jlong> values(static_cast<size_t>(length), fill);
    env()->SetLongArrayRegion(array, 0, length, values.data());
    return array;
}

std::vector<jlong> elements(jlongArray array) {
    std::vector<jlong> out(static_cast<size_t>(env()->GetArrayLength(array)));
    env()->GetLongArrayRegion(array, 0, static_cast<jsize>(out.size()), out.data());
    return out;
}

std::vector<jlong> captureStatistics(jlong stream) {
    Local<jlongArray> out = newLongArray(16, -1);
    EXPECT_EQ(0, mme("captureStatistics", "(JJ[J)I", {J(7), J(stream), L(out)}));
    return elements(out);
}

V upcalls() {
    Local<jobjectArray> array(
            static_cast<jobjectArray>(callStatic(kUpcallLog, "callArray", "()[Ljava/lang/String;").l));
    V out;
    for (jsize i = 0; array.get() != nullptr && i < env()->GetArrayLength(array); ++i) {
        out.push_back(toString(Local<jstring>(static_cast<jstring>(env()->GetObjectArrayElement(array, i)))));
    }
    return out;
}

::testing::Matcher<std::string> onAttachedThread(const std::string& call) {
    return ::testing::AllOf(
            ::testing::StartsWith(call + " on Thread-"),
            ::testing::ResultOf([](const std::string& s) { return javaThreadAlive(threadOf(s)); }, false));
}

bool javaThreadAlive(const std::string& name) {
    // The map holds live threads only; each shows as "Thread[<name>,<priority>,<group>]"
    // (later JDKs: "Thread[#<id>,<name>,...]").
    Local<jobject> threads(callStatic("java/lang/Thread", "getAllStackTraces", "()Ljava/util/Map;").l);
    const std::string all = describe(threads);
    return all.find("[" + name + ",") != std::string::npos || all.find("," + name + ",") != std::string::npos;
}

tagMVD_EVNT mvdEvent(int number) {
    tagMVD_EVNT event{};
    event.aiWord[0] = number;
    for (int i = 1; i < MVD_EVNT_WORDS; ++i) event.aiWord[i] = 100 + i;
    return event;
}

V bridgeLines(const LogCapture& log) {
    V out;
    for (const LogLine& line : log.linesWithTag("Mme_JNI")) {
        if (line.priority == ANDROID_LOG_INFO) out.push_back(line.text);
    }
    return out;
}

jint vceServiceInit() {
    enginetest::modem();
    Local<jobject> service = newObject(kVceService, "()V");
    Local<jclass> cls(findClass(kVceService));
    const jint result = env()->CallIntMethod(service, env()->GetMethodID(cls, "init", "()I"));
    settle("VceService.init");
    return result;
}

android::sp<android::IBinder> registeredService() {
    return android::defaultServiceManager()->checkService(android::String16("VideoCallEngineService"));
}

int32_t sendToService(uint32_t code, std::initializer_list<int32_t> ints,
                      const android::sp<android::IBinder>& binder) {
    android::Parcel request, reply;
    for (int32_t v : ints) request.writeInt32(v);
    if (binder != nullptr) request.writeStrongBinder(binder);
    const android::sp<android::IBinder> service = registeredService();
    const android::status_t status =
            service != nullptr ? service->transact(code, request, &reply) : android::NAME_NOT_FOUND;
    if (status != android::NO_ERROR) return -1000 - status;
    reply.setDataPosition(0);
    return reply.readInt32();
}

void JvmCase::SetUp() {
    ++gCases;
    hostfakes::reset();
    log.clear();
    std::lock_guard<std::mutex> lock(gOutputLock);
    gWarnings.clear();
}

void JvmCase::TearDown() {
    if (gVm == nullptr) return;
    EXPECT_FALSE(env()->ExceptionCheck()) << "an exception is left pending on the main thread";
    env()->ExceptionClear();
    {
        std::lock_guard<std::mutex> lock(gOutputLock);
        EXPECT_EQ(V{}, gWarnings) << "the JVM warned about JNI use";
    }
    // The next case in this process starts with quiet stand-ins.
    if (Local<jclass>(findClass(kUpcallLog)).get() != nullptr) {
        setUpcallThrowing(false);
        setUpcallResult(0);
        clearUpcalls();
    }
}

bool JvmCase::firstInProcess() { return gCases == 1; }

void JvmCase::load() {
    static const std::string loaded = loadLibrary();
    ASSERT_EQ("", loaded) << lastMessage();
}

}  // namespace jvmtest
