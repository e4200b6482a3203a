#include "ScopedJniEnv.h"

namespace android {

ScopedJniEnv::ScopedJniEnv(JavaVM* vm) : mVm(vm) {
    if (mVm == nullptr) return;
    void* env = nullptr;
    if (mVm->GetEnv(&env, JNI_VERSION_1_4) == JNI_OK) {
        mEnv = static_cast<JNIEnv*>(env);
        return;
    }
    if (mVm->AttachCurrentThread(&mEnv, nullptr) == JNI_OK && mEnv != nullptr) {
        mAttached = true;
    } else {
        mEnv = nullptr;
    }
}

ScopedJniEnv::~ScopedJniEnv() {
    if (mAttached) mVm->DetachCurrentThread();
}

void clearUpcallException(JNIEnv* env, const char* tag, const char* upcall) {
    if (!env->ExceptionCheck()) return;
    env->ExceptionClear();
    __android_log_print(ANDROID_LOG_ERROR, tag, "%s: Java exception cleared", upcall);
}

}  // namespace android
