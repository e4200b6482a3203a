#include "JvmHarness.h"

#include <cstdlib>
#include <mutex>
#include <stdexcept>

namespace jvmtest {

namespace {

std::string gClassPath = QUELLBORN_JAVA_CLASSES;
JavaVM* gVm = nullptr;
std::once_flag gOnce;

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
    };
    JavaVMInitArgs args{};
    args.version = JNI_VERSION_1_6;
    args.nOptions = sizeof(options) / sizeof(options[0]);
    args.options = options;
    args.ignoreUnrecognized = JNI_FALSE;
    JNIEnv* env = nullptr;
    if (JNI_CreateJavaVM(&gVm, &env, &args) != JNI_OK) throw std::runtime_error("JNI_CreateJavaVM failed");
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

std::string takeException(JNIEnv* e) {
    jthrowable thrown = e->ExceptionOccurred();
    if (thrown == nullptr) return "";
    e->ExceptionClear();
    jclass cls = e->GetObjectClass(thrown);
    jclass classClass = e->FindClass("java/lang/Class");
    jmethodID getName = e->GetMethodID(classClass, "getName", "()Ljava/lang/String;");
    auto name = static_cast<jstring>(e->CallObjectMethod(cls, getName));
    std::string out = toString(e, name);
    jclass throwableClass = e->FindClass("java/lang/Throwable");
    jmethodID getMessage = e->GetMethodID(throwableClass, "getMessage", "()Ljava/lang/String;");
    auto message = static_cast<jstring>(e->CallObjectMethod(thrown, getMessage));
    if (message != nullptr) {
        lastMessage() = toString(e, message);
        e->DeleteLocalRef(message);
    }
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

jclass findClass(const char* name) {
    JNIEnv* e = env();
    jclass cls = e->FindClass(name);
    if (cls == nullptr) takeException(e);
    return cls;
}

std::vector<std::string> upcalls() {
    JNIEnv* e = env();
    jclass log = e->FindClass("com/tessaroval/vce/UpcallLog");
    jmethodID callArray = e->GetStaticMethodID(log, "callArray", "()[Ljava/lang/String;");
    auto array = static_cast<jobjectArray>(e->CallStaticObjectMethod(log, callArray));
    std::vector<std::string> out;
    const jsize n = e->GetArrayLength(array);
    for (jsize i = 0; i < n; ++i) {
        auto item = static_cast<jstring>(e->GetObjectArrayElement(array, i));
        out.push_back(toString(e, item));
        e->DeleteLocalRef(item);
    }
    e->DeleteLocalRef(array);
    e->DeleteLocalRef(log);
    return out;
}

void clearUpcalls() {
    JNIEnv* e = env();
    jclass log = e->FindClass("com/tessaroval/vce/UpcallLog");
    e->CallStaticVoidMethod(log, e->GetStaticMethodID(log, "clear", "()V"));
    e->DeleteLocalRef(log);
}

std::string toString(JNIEnv* e, jstring text) {
    if (text == nullptr) return "<null>";
    const char* chars = e->GetStringUTFChars(text, nullptr);
    std::string out = chars != nullptr ? chars : "";
    e->ReleaseStringUTFChars(text, chars);
    return out;
}

}  // namespace jvmtest
