// The Mme natives through which the application runs the media engine.
#include <android/log.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>

#include "Mme.h"
#include "MmeJni.h"
#include "Zos.h"

namespace android {

namespace {

#define LOGI(...) __android_log_print(ANDROID_LOG_INFO, kMmeNativeTag, __VA_ARGS__)

constexpr unsigned int kRuntimeLogLevel = 255;
constexpr size_t kVersionSize = 512;
constexpr int kStatisticsLength = 16;

// Java log level -> the engine's two levels.
struct LogLevels {
    unsigned int level;
    unsigned int levelX;
};
constexpr LogLevels kLogLevels[] = {{0, 0}, {15, 6}, {255, 11}, {15, 12}};

struct FreeDeleter {
    void operator()(char* p) const { free(p); }
};
using NativeText = std::unique_ptr<char, FreeDeleter>;

NativeText text(JNIEnv* env, jstring jstr) { return NativeText(jstringTostring(env, jstr)); }

const char* printable(const char* s) { return s != nullptr ? s : "(null)"; }

// Cuts a text that was truncated at the buffer's end back to a whole UTF-8
// character, so no half character reaches Java.
void trimPartialCharacter(char* buffer) {
    size_t length = strlen(buffer);
    size_t start = length;
    while (start > 0 && (static_cast<unsigned char>(buffer[start - 1]) & 0xC0) == 0x80) --start;
    if (start == 0) return;
    const unsigned char lead = static_cast<unsigned char>(buffer[start - 1]);
    const size_t expected = lead >= 0xF0 ? 4 : lead >= 0xE0 ? 3 : lead >= 0xC0 ? 2 : 1;
    if (length - (start - 1) < expected) buffer[start - 1] = '\0';
}

void stopEngine() {
    Mvd_TaskStop();
    Mme_Stop();
    Zos_SysDestroy();
}

struct Upcall {
    std::atomic<jmethodID>* id;
    const char* name;
    const char* signature;
};

const Upcall kUpcalls[] = {
        {&ZpandModPostDrv, "zpandModPostDrv", "()I"},
        {&ZpandTimerInit, "zpandTimerInit", "()I"},
        {&ZpandTimerDestroy, "zpandTimerDestroy", "()I"},
        {&ZpandTimerStart, "zpandTimerStart", "(J)I"},
        {&ZpandTimerStop, "zpandTimerStop", "()I"},
        {&mvdCodecChanged, "mvdCodecChanged", "(JJ)I"},
        {&mvdImgOrntChanged, "mvdImgOrntChanged", "(III)I"},
        {&mvdCapSizeChanged, "mvdCaptureSizeChanged", "(II)I"},
        {&mvdMagnViewChanged, "mvdMagnViewChanged", "(I)I"},
};

}  // namespace

std::atomic<int32_t> m_lastRtcpSta[4] = {{0}, {0}, {0}, {0}};
std::atomic<uint32_t> m_lastCodecChange[2] = {{0}, {0}};

jint sysInit(JNIEnv* env, jclass cls) {
    LOGI("%s", "sysInit");
    Zos_CfgSetLogLevel(kRuntimeLogLevel);
    Zos_CfgSetLogDisp(Mme_Print);
    Mme_CfgSetDumpDebug(1);
    Mme_CfgSetPrintDebug(1);

    LOGI("%s", "Zos_SysInit");
    bool started = Zos_SysInit() == 0;
    if (started) {
        LOGI("%s", "Mme_Start");
        started = Mme_Start() == 0;
    }
    if (started) {
        LOGI("%s", "Mvd_TaskStart");
        started = Mvd_TaskStart() == 0;
    }
    if (!started) {
        stopEngine();
        return 1;
    }

    Mvd_EvntSetCallback(Mvd_EvntProc, 1);
    jcl = static_cast<jclass>(env->NewGlobalRef(cls));
    for (const Upcall& upcall : kUpcalls) {
        jmethodID id = env->GetStaticMethodID(cls, upcall.name, upcall.signature);
        // A missing method only disables its upcall; its NoSuchMethodError
        // must not escape into the application.
        if (id == nullptr) env->ExceptionClear();
        *upcall.id = id;
    }
    Zpand_ModSetPostDrv(JniZpandModPostDrv);
    Zpand_TimerSetInit(JniZpandTimerInit);
    Zpand_TimerSetDestroy(JniZpandTimerDestroy);
    Zpand_TimerSetStart(JniZpandTimerStart);
    Zpand_TimerSetStop(JniZpandTimerStop);
    return 0;
}

jint sysDestroy(JNIEnv*, jclass) {
    LOGI("%s", "sysDestroy");
    stopEngine();
    return 0;
}

jint cfgSetWorkDir(JNIEnv* env, jclass, jstring dir) {
    NativeText directory = text(env, dir);
    LOGI("%s, %s", "cfgSetWorkDir", printable(directory.get()));
    Mme_CfgSetCfgDir(directory.get());
    Mme_CfgSetLogDir(directory.get());
    return Zos_CfgSetLogDir(directory.get());
}

jint cfgSetAppCtx(JNIEnv* env, jclass, jobject context) {
    LOGI("%s", "cfgSetAppCtx");
    // Kept by the runtime for the life of the process.
    return Zos_CfgSetAppCtx(env->NewGlobalRef(context));
}

jstring mmeGetVer(JNIEnv* env, jclass) {
    // Each library is asked once, the video library first.
    const char* melon = Melon_GetVersion();
    const char* mme = Mme_GetVer();
    char version[kVersionSize];
    snprintf(version, sizeof(version), "%s|%s", melon != nullptr ? melon : "", mme != nullptr ? mme : "");
    trimPartialCharacter(version);
    LOGI("%s, %s", "mmeGetVer", version);
    return newJavaString(env, version);
}

jint mmeSetLogLevel(JNIEnv*, jclass, jint level) {
    LOGI("%s, %d", "mmeSetLogLevel", level);
    const auto index = static_cast<uint32_t>(level);
    if (index < sizeof(kLogLevels) / sizeof(kLogLevels[0])) {
        Mme_CfgSetLogLevel(kLogLevels[index].level);
        Mme_CfgSetLogLevelX(kLogLevels[index].levelX);
    }
    return 0;
}

jint captureStatistics(JNIEnv* env, jclass, jlong, jlong streamId, jlongArray out) {
    LOGI("%s", "captureStatistics");
    if (streamId != 0) {
        tagMVD_RTCP_STA stats{};
        if (Mvd_RtcpGetSta(static_cast<uint32_t>(streamId), &stats) == 0) {
            m_lastRtcpSta[0] = stats.aiWord[1];
            m_lastRtcpSta[1] = stats.aiWord[0];
            m_lastRtcpSta[2] = stats.aiWord[5];
            m_lastRtcpSta[3] = stats.aiWord[4];
        }
    }
    jlong values[kStatisticsLength] = {};
    for (int i = 0; i < 4; ++i) values[4 + i] = m_lastRtcpSta[i].load();
    values[14] = static_cast<int32_t>(m_lastCodecChange[0].load());
    values[15] = static_cast<int32_t>(m_lastCodecChange[1].load());
    if (out == nullptr) {
        // Left to the caller as the exception a Java method would throw.
        jclass npe = env->FindClass("java/lang/NullPointerException");
        if (npe != nullptr) env->ThrowNew(npe, "captureStatistics: null output array");
        return 0;
    }
    env->SetLongArrayRegion(out, 0, kStatisticsLength, values);
    return 0;
}

jboolean provGetValueBool(JNIEnv* env, jclass, jstring key) {
    NativeText k = text(env, key);
    return Mme_ProvGetValueBool(k.get()) != 0 ? JNI_TRUE : JNI_FALSE;
}

jint provGetValueInt(JNIEnv* env, jclass, jstring key) {
    NativeText k = text(env, key);
    return Mme_ProvGetValueInt(k.get());
}

jint provGetValueEnum(JNIEnv* env, jclass, jstring key) {
    NativeText k = text(env, key);
    return Mme_ProvGetValueEnum(k.get());
}

jstring provGetValueStr(JNIEnv* env, jclass, jstring key) {
    NativeText k = text(env, key);
    return newJavaString(env, Mme_ProvGetValueStr(k.get()));
}

jstring provGetMapStr(JNIEnv* env, jclass, jstring key, jint index) {
    NativeText k = text(env, key);
    return newJavaString(env, Mme_ProvGetMapStr(k.get(), index));
}

jint startRpcTest(JNIEnv*, jclass) { return 0; }
jint endRpcTest(JNIEnv*, jclass) { return 0; }

}  // namespace android
