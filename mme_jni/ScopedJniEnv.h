// The one way native code reaches Java: get the calling thread's JNI
// environment from the virtual machine, attaching the thread for the length
// of one call when the machine does not know it yet, and detaching it again.
#ifndef QUELLBORN_MME_JNI_SCOPEDJNIENV_H
#define QUELLBORN_MME_JNI_SCOPEDJNIENV_H

#include <android/log.h>
#include <jni.h>

namespace android {

class ScopedJniEnv {
public:
    // A null machine gives no environment (and attaches nothing).
    explicit ScopedJniEnv(JavaVM* vm);
    ~ScopedJniEnv();
    ScopedJniEnv(const ScopedJniEnv&) = delete;
    ScopedJniEnv& operator=(const ScopedJniEnv&) = delete;

    JNIEnv* get() const { return mEnv; }
    JNIEnv* operator->() const { return mEnv; }
    bool attachedHere() const { return mAttached; }

private:
    JavaVM* mVm;
    JNIEnv* mEnv = nullptr;
    bool mAttached = false;
};

// A Java exception left pending by an upcall would poison every later JNI
// call on a thread that stays attached; it is logged and cleared.
void clearUpcallException(JNIEnv* env, const char* tag, const char* upcall);

// Calls a static int Java method from any native thread. Does nothing and
// answers 0 when the machine, the class or the method is missing, or the
// thread cannot be attached.
template <typename... Args>
jint callStaticIntUpcall(JavaVM* vm, jclass cls, jmethodID method, const char* tag,
                         const char* upcall, Args... args) {
    if (vm == nullptr || cls == nullptr || method == nullptr) return 0;
    ScopedJniEnv env(vm);
    if (env.get() == nullptr) return 0;
    const jint result = env->CallStaticIntMethod(cls, method, args...);
    clearUpcallException(env.get(), tag, upcall);
    return result;
}

}  // namespace android

#endif  // QUELLBORN_MME_JNI_SCOPEDJNIENV_H
