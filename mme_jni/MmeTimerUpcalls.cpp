// The runtime's one timer and its module messages, run through Mme's static
// Java methods.
#include <android/log.h>

#include "MmeJni.h"
#include "Zos.h"

namespace android {

namespace {

#define LOGI(...) __android_log_print(ANDROID_LOG_INFO, kMmeNativeTag, __VA_ARGS__)

// Timer lengths are in thousandths of the unit of Zos_Time.
constexpr unsigned int kLengthPerTimeUnit = 1000;

}  // namespace

std::atomic<PFN_ZOSTIMERACTIVE> m_pfnZosTimerActive{nullptr};
std::atomic<uint32_t> m_zosTimerExpire{0};

int JniZpandModPostDrv() {
    return mmeUpcall(ZpandModPostDrv, "JniZpandModPostDrv");
}

int JniZpandTimerInit() {
    LOGI("%s", "JniZpandTimerInit");
    return mmeUpcall(ZpandTimerInit, "JniZpandTimerInit");
}

int JniZpandTimerDestroy() {
    LOGI("%s", "JniZpandTimerDestroy");
    return mmeUpcall(ZpandTimerDestroy, "JniZpandTimerDestroy");
}

int JniZpandTimerStart(unsigned int length, PFN_ZOSTIMERACTIVE callback) {
    LOGI("%s", "JniZpandTimerStart");
    m_pfnZosTimerActive = callback;
    if (ZpandTimerStart.load() == nullptr) return 0;
    m_zosTimerExpire = Zos_Time(nullptr) + length / kLengthPerTimeUnit;
    return mmeUpcall(ZpandTimerStart, "JniZpandTimerStart", static_cast<jlong>(length));
}

int JniZpandTimerStop() {
    LOGI("%s", "JniZpandTimerStop");
    if (ZpandTimerStop.load() == nullptr) return 0;
    m_zosTimerExpire = 0;
    return mmeUpcall(ZpandTimerStop, "JniZpandTimerStop");
}

jint zpandModDriveMsg(JNIEnv*, jclass) {
    Zos_ModDriveMsg();
    return 0;
}

jint zpandTimerActive(JNIEnv*, jclass) {
    const PFN_ZOSTIMERACTIVE callback = m_pfnZosTimerActive.load();
    if (callback == nullptr) return 0;
    const auto late = static_cast<int32_t>(Zos_Time(nullptr) - m_zosTimerExpire.load());
    callback(false);
    return late;
}

}  // namespace android
