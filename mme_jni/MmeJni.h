// The bridge between the Java class Mme and the media engine: the natives
// Mme exports, the upcalls the engine makes into Mme's static methods, and
// the process-wide state they share.
//
// Sources by subject: MmeRegistration.cpp (registration, shared state,
// string conversion, print sink), MmeSystemNatives.cpp (start/stop,
// configuration, version, provisioning, statistics), MmeTimerUpcalls.cpp
// (the runtime's timer and module messages), MmeVideoEvents.cpp (video
// events). ScopedJniEnv.h holds the attach-call-detach procedure.
#ifndef QUELLBORN_MME_JNI_MMEJNI_H
#define QUELLBORN_MME_JNI_MMEJNI_H

#include <jni.h>

#include <atomic>
#include <cstdint>

#include "Mvd.h"
#include "Zpand.h"

namespace android {

constexpr const char* kMmeNativeTag = "Mme_JNI";

// Registers the Mme natives on "<prefix>/Mme": 0, -2 when the class is not
// found, -1 when registration fails.
int registerMmeNatives(JavaVM* vm, JNIEnv* env, const char* classPathPrefix);

// UTF-8 bytes of a Java string in a malloc'd, NUL-terminated buffer the
// caller frees; null for the empty string and for a null reference.
char* jstringTostring(JNIEnv* env, jstring jstr);

// A Java string of any native text: ASCII goes through NewStringUTF; other
// bytes are decoded as UTF-8 by java.lang.String, since NewStringUTF only
// takes modified UTF-8. Null gives "".
jstring newJavaString(JNIEnv* env, const char* text);

// The media engine's print sink.
extern "C" int Mme_Print(const char* text);

// Shared state. Written on the Java thread that loads the library or runs
// sysInit, read on the media engine's threads: atomics keep that clean.
extern std::atomic<JavaVM*> cached_jvm;
extern std::atomic<jclass> jcl;
extern std::atomic<jmethodID> ZpandModPostDrv;
extern std::atomic<jmethodID> ZpandTimerInit;
extern std::atomic<jmethodID> ZpandTimerDestroy;
extern std::atomic<jmethodID> ZpandTimerStart;
extern std::atomic<jmethodID> ZpandTimerStop;
extern std::atomic<jmethodID> mvdCodecChanged;
extern std::atomic<jmethodID> mvdImgOrntChanged;
extern std::atomic<jmethodID> mvdCapSizeChanged;
extern std::atomic<jmethodID> mvdMagnViewChanged;

extern std::atomic<PFN_ZOSTIMERACTIVE> m_pfnZosTimerActive;
extern std::atomic<uint32_t> m_zosTimerExpire;
extern std::atomic<int32_t> m_lastRtcpSta[4];
extern std::atomic<uint32_t> m_lastCodecChange[2];

// Calls a static int method of Mme from any thread (see ScopedJniEnv.h).
template <typename... Args>
jint mmeUpcall(const std::atomic<jmethodID>& method, const char* upcall, Args... args);

// Natives (registered on Mme).
jint sysInit(JNIEnv* env, jclass cls);
jint sysDestroy(JNIEnv* env, jclass cls);
jint cfgSetWorkDir(JNIEnv* env, jclass cls, jstring dir);
jint cfgSetAppCtx(JNIEnv* env, jclass cls, jobject context);
jstring mmeGetVer(JNIEnv* env, jclass cls);
jint mmeSetLogLevel(JNIEnv* env, jclass cls, jint level);
jint captureStatistics(JNIEnv* env, jclass cls, jlong unused, jlong streamId, jlongArray out);
jint zpandModDriveMsg(JNIEnv* env, jclass cls);
jint zpandTimerActive(JNIEnv* env, jclass cls);
jboolean provGetValueBool(JNIEnv* env, jclass cls, jstring key);
jint provGetValueInt(JNIEnv* env, jclass cls, jstring key);
jint provGetValueEnum(JNIEnv* env, jclass cls, jstring key);
jstring provGetValueStr(JNIEnv* env, jclass cls, jstring key);
jstring provGetMapStr(JNIEnv* env, jclass cls, jstring key, jint index);
jint startRpcTest(JNIEnv* env, jclass cls);
jint endRpcTest(JNIEnv* env, jclass cls);

// Upcalls installed into the runtime.
int JniZpandModPostDrv();
int JniZpandTimerInit();
int JniZpandTimerDestroy();
int JniZpandTimerStart(unsigned int length, PFN_ZOSTIMERACTIVE callback);
int JniZpandTimerStop();

// Video events.
extern "C" int Mvd_EvntProc(tagMVD_EVNT* event, unsigned int cookie);
const char* Mme_GetMvdEventName(int event);
int JniMvdCapSizeChanged(uint32_t width, uint32_t height);
int JniMvdCodecChanged(uint32_t value1, uint32_t value2);
int JniMvdImgOrntChanged(uint32_t value1, uint32_t value2, uint32_t value3);
int JniMvdMagnViewChanged(uint32_t value);

}  // namespace android

#include "ScopedJniEnv.h"

namespace android {

template <typename... Args>
jint mmeUpcall(const std::atomic<jmethodID>& method, const char* upcall, Args... args) {
    return callStaticIntUpcall(cached_jvm.load(), jcl.load(), method.load(), kMmeNativeTag, upcall,
                               args...);
}

}  // namespace android

#endif  // QUELLBORN_MME_JNI_MMEJNI_H
