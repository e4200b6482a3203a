#include "MmeEventObserver.h"

#include <android/log.h>

#include "ObserverCalls.h"

namespace android {

std::atomic<MmeEventObserver*> m_pMmeEventObserver{nullptr};

namespace {

ObserverCalls& observerCalls() {
    // Event threads may still call while the process exits.
    static auto* calls = new ObserverCalls();
    return *calls;
}

}  // namespace

int registerMmeEventObserver(MmeEventObserver* observer) {
    __android_log_print(ANDROID_LOG_INFO, "Mme-JNI", "registerMmeEventObserver ");
    m_pMmeEventObserver = observer;
    return 0;
}

void unregisterMmeEventObserver(MmeEventObserver* observer) {
    observerCalls().unregister(m_pMmeEventObserver, observer);
}

bool forwardMmeEvent(int event) {
    ObserverCalls::Call call(observerCalls());
    MmeEventObserver* observer = m_pMmeEventObserver.load();
    if (observer == nullptr) return false;
    observer->mmeEvtUpdate(event);
    return true;
}

}  // namespace android
