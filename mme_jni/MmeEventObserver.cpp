#include "MmeEventObserver.h"

#include <android/log.h>

namespace android {

std::atomic<MmeEventObserver*> m_pMmeEventObserver{nullptr};

int registerMmeEventObserver(MmeEventObserver* observer) {
    __android_log_print(ANDROID_LOG_INFO, "Mme-JNI", "registerMmeEventObserver ");
    m_pMmeEventObserver = observer;
    return 0;
}

}  // namespace android
