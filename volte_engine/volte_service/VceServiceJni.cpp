#include "VceServiceJni.h"

#include <android/log.h>

#include "MmeJni.h"
#include "ScopedJniEnv.h"
#include "VideoCallEngineService.h"

namespace {

constexpr const char* kTag = "VCEService-JNI";
constexpr const char* kVceServiceClass = "com/tessaroval/vce/VceService";
constexpr const char* kPackagePath = "com/tessaroval/vce";
constexpr jint kInitResult = 2;

#define LOGI(...) __android_log_print(ANDROID_LOG_INFO, kTag, __VA_ARGS__)
#define LOGE(...) __android_log_print(ANDROID_LOG_ERROR, kTag, __VA_ARGS__)

jmethodID getScreenOrientationId = nullptr;

const JNINativeMethod kVceServiceNatives[] = {
        {"init", "()I", reinterpret_cast<void*>(VideoCallEngineService_init)},
};

}  // namespace

JavaVM* vce_jvm = nullptr;
jclass clazz = nullptr;

extern "C" JNIEXPORT jint JNI_OnLoad(JavaVM* vm, void* /*reserved*/) {
    vce_jvm = vm;
    LOGI("JNI_OnLoad, libquellborn.so is built on %s %s\n", __DATE__, __TIME__);
    void* envp = nullptr;
    if (vm->GetEnv(&envp, JNI_VERSION_1_4) != JNI_OK) {
        LOGE("GetEnv failed\n");
        return -1;
    }
    auto* env = static_cast<JNIEnv*>(envp);

    jint result = JNI_VERSION_1_4;
    jclass cls = env->FindClass(kVceServiceClass);
    if (cls == nullptr) {
        env->ExceptionClear();
        LOGI("can not find com/tessaroval/vce/VceService");
        result = -1;
    } else {
        clazz = static_cast<jclass>(env->NewGlobalRef(cls));
        getScreenOrientationId = env->GetStaticMethodID(cls, "getScreenOrientation", "()I");
        // Without the method the upcall answers 0; the library still loads.
        if (getScreenOrientationId == nullptr) env->ExceptionClear();
        if (env->RegisterNatives(cls, kVceServiceNatives, 1) != 0) {
            env->ExceptionClear();
            LOGE("RegisterNatives failed");
            result = -1;
        } else {
            const int mme = android::registerMmeNatives(vm, env, kPackagePath);
            if (mme < 0) result = mme;
        }
    }
    env->DeleteLocalRef(cls);
    return result;
}

jint VideoCallEngineService_init(JNIEnv* /*env*/, jobject /*thiz*/) {
    LOGI("init");
    const android::status_t status = android::VideoCallEngineService::instantiate();
    LOGI("VideoCallEngineService::Instance return %d", status);
    return kInitResult;
}

int getScreenOrientation() {
    return android::callStaticIntUpcall(vce_jvm, clazz, getScreenOrientationId, kTag,
                                        "getScreenOrientation");
}
