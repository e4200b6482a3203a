// Registration of the Mme natives, the bridge's shared state, string
// conversion and the media engine's print sink.
#include <android/log.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "MmeJni.h"

namespace android {

namespace {

constexpr const char* kRegistrationTag = "Mme-JNI";
constexpr size_t kClassNameSize = 100;

#define NATIVE(name, signature) {#name, signature, reinterpret_cast<void*>(name)}

const JNINativeMethod kMmeNatives[] = {
        NATIVE(cfgSetWorkDir, "(Ljava/lang/String;)I"),
        NATIVE(cfgSetAppCtx, "(Landroid/content/Context;)I"),
        NATIVE(sysInit, "()I"),
        NATIVE(sysDestroy, "()I"),
        NATIVE(mmeGetVer, "()Ljava/lang/String;"),
        NATIVE(mmeSetLogLevel, "(I)I"),
        NATIVE(captureStatistics, "(JJ[J)I"),
        NATIVE(zpandModDriveMsg, "()I"),
        NATIVE(zpandTimerActive, "()I"),
        NATIVE(provGetValueBool, "(Ljava/lang/String;)Z"),
        NATIVE(provGetValueInt, "(Ljava/lang/String;)I"),
        NATIVE(provGetValueEnum, "(Ljava/lang/String;)I"),
        NATIVE(provGetValueStr, "(Ljava/lang/String;)Ljava/lang/String;"),
        NATIVE(provGetMapStr, "(Ljava/lang/String;I)Ljava/lang/String;"),
        NATIVE(startRpcTest, "()I"),
        NATIVE(endRpcTest, "()I"),
};

#undef NATIVE

bool isAscii(const char* text) {
    for (const unsigned char* p = reinterpret_cast<const unsigned char*>(text); *p != 0; ++p) {
        if (*p >= 0x80) return false;
    }
    return true;
}

}  // namespace

std::atomic<JavaVM*> cached_jvm{nullptr};
std::atomic<jclass> jcl{nullptr};
std::atomic<jmethodID> ZpandModPostDrv{nullptr};
std::atomic<jmethodID> ZpandTimerInit{nullptr};
std::atomic<jmethodID> ZpandTimerDestroy{nullptr};
std::atomic<jmethodID> ZpandTimerStart{nullptr};
std::atomic<jmethodID> ZpandTimerStop{nullptr};
std::atomic<jmethodID> mvdCodecChanged{nullptr};
std::atomic<jmethodID> mvdImgOrntChanged{nullptr};
std::atomic<jmethodID> mvdCapSizeChanged{nullptr};
std::atomic<jmethodID> mvdMagnViewChanged{nullptr};

int registerMmeNatives(JavaVM* vm, JNIEnv* env, const char* classPathPrefix) {
    cached_jvm = vm;
    char className[kClassNameSize];
    const int needed = snprintf(className, sizeof(className), "%s/Mme",
                                classPathPrefix != nullptr ? classPathPrefix : "");
    if (needed < 0 || static_cast<size_t>(needed) >= sizeof(className)) {
        // A cut name could name some other class; it is treated as not found.
        __android_log_print(ANDROID_LOG_ERROR, kRegistrationTag, "Failed to find class: %s", className);
        return -2;
    }
    jclass cls = env->FindClass(className);
    if (cls == nullptr) {
        env->ExceptionClear();  // the NoClassDefFoundError would fail the load for the wrong reason
        __android_log_print(ANDROID_LOG_ERROR, kRegistrationTag, "Failed to find class: %s", className);
        return -2;
    }
    __android_log_print(ANDROID_LOG_INFO, kRegistrationTag, "RegisterNatives, kClassName %s", className);
    const jint registered = env->RegisterNatives(
            cls, kMmeNatives, static_cast<jint>(sizeof(kMmeNatives) / sizeof(kMmeNatives[0])));
    env->DeleteLocalRef(cls);
    if (registered != 0) {
        env->ExceptionClear();
        __android_log_print(ANDROID_LOG_ERROR, kRegistrationTag, "RegisterNatives failed");
        return -1;
    }
    return 0;
}

char* jstringTostring(JNIEnv* env, jstring jstr) {
    // A null reference reads as no text; asking it for bytes would throw.
    if (jstr == nullptr) return nullptr;
    jclass stringClass = env->FindClass("java/lang/String");
    jstring encoding = env->NewStringUTF("utf-8");
    jmethodID getBytes = env->GetMethodID(stringClass, "getBytes", "(Ljava/lang/String;)[B");
    auto bytes = static_cast<jbyteArray>(env->CallObjectMethod(jstr, getBytes, encoding));
    if (env->ExceptionCheck()) {
        env->ExceptionClear();  // no bytes to be had: read as no text
        bytes = nullptr;
    }
    char* result = nullptr;
    if (bytes != nullptr) {
        const jsize length = env->GetArrayLength(bytes);
        jbyte* elements = env->GetByteArrayElements(bytes, nullptr);
        if (length >= 1 && elements != nullptr) {
            result = static_cast<char*>(malloc(static_cast<size_t>(length) + 1));
            if (result != nullptr) {
                memcpy(result, elements, static_cast<size_t>(length));
                result[length] = '\0';
            }
        }
        if (elements != nullptr) env->ReleaseByteArrayElements(bytes, elements, 0);
        env->DeleteLocalRef(bytes);
    }
    env->DeleteLocalRef(encoding);
    env->DeleteLocalRef(stringClass);
    return result;
}

jstring newJavaString(JNIEnv* env, const char* text) {
    if (text == nullptr) text = "";
    if (isAscii(text)) return env->NewStringUTF(text);
    const jsize length = static_cast<jsize>(strlen(text));
    jbyteArray bytes = env->NewByteArray(length);
    if (bytes == nullptr) return nullptr;
    env->SetByteArrayRegion(bytes, 0, length, reinterpret_cast<const jbyte*>(text));
    jclass stringClass = env->FindClass("java/lang/String");
    jmethodID ctor = env->GetMethodID(stringClass, "<init>", "([BLjava/lang/String;)V");
    jstring encoding = env->NewStringUTF("UTF-8");
    auto result = static_cast<jstring>(env->NewObject(stringClass, ctor, bytes, encoding));
    if (env->ExceptionCheck()) {
        env->ExceptionClear();
        result = nullptr;
    }
    env->DeleteLocalRef(encoding);
    env->DeleteLocalRef(stringClass);
    env->DeleteLocalRef(bytes);
    return result;
}

extern "C" int Mme_Print(const char* text) {
    __android_log_print(ANDROID_LOG_INFO, "MME", "%s", text != nullptr ? text : "");
    return 0;
}

}  // namespace android
