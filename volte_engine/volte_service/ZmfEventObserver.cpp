#include "ZmfEventObserver.h"

#include <android/log.h>

#include <cstring>
#include <vector>

#include "ObserverCalls.h"
#include "Zmf.h"

__attribute__((visibility("default"))) unsigned char _zmf = 0;

namespace android {

namespace {

constexpr const char* kTag = "VideoCallEngineZmf";

#define LOGI(...) __android_log_print(ANDROID_LOG_INFO, kTag, __VA_ARGS__)
#define LOGE(...) __android_log_print(ANDROID_LOG_ERROR, kTag, __VA_ARGS__)

// Event numbers the library reports for captures and renders.
constexpr int kFirstEvent = 20;
constexpr int kLastEvent = 30;
constexpr int kCaptureStarted = 20;
constexpr int kCaptureStopped = 21;
constexpr int kCaptureFace = 22;
constexpr int kNotScanned1 = 23;
constexpr int kNotScanned2 = 24;
constexpr int kRenderAdded = 25;
constexpr int kRenderStarted = 26;
constexpr int kRenderSizeA = 27;
constexpr int kRenderSize = 28;
constexpr int kRenderRemoved = 29;
constexpr int kCaptureSize = 30;

constexpr const char* kTemplateCapture =
        "{\"Capture\":\"%s\",\"Width\":%d,\"Height\":%d,\"FrameRate\":%d}";
constexpr const char* kTemplateCaptureId = "{\"Capture\":\"%s\"}";
constexpr const char* kTemplateCaptureFace =
        "{\"Capture\":\"%s\",\"Face\":%d,\"Width\":%d,\"Height\":%d}";
constexpr const char* kTemplateRender =
        "{\"Render\":\"%s\",\"SourceType\":%d,\"Width\":%d,\"Height\":%d}";
constexpr const char* kTemplateRenderWindowSize =
        "{\"Render\":\"%s\",\"SourceType\":%d,\"Window\":%ld,\"Width\":%d,\"Height\":%d}";
constexpr const char* kTemplateRenderWindow =
        "{\"Render\":\"%s\",\"SourceType\":%d,\"Window\":%ld}";

// Values scanned out of one event. The library copies %s as far as the text
// goes, whatever the caller's buffer holds, so the id's buffer is as long as
// the whole text: no id scanned out of it can be longer.
struct EventValues {
    explicit EventValues(const char* json) : idBuffer(strlen(json) + 1, '\0'), id(idBuffer.data()) {}
    EventValues(const EventValues&) = delete;
    EventValues& operator=(const EventValues&) = delete;
    std::vector<char> idBuffer;
    char* id;
    int sourceType = 0;
    int face = 0;
    int width = 0;
    int height = 0;
    int frameRate = 0;
    long window = 0;  // the platform's long: 32 bits on the device, 64 on the host
};

// An id longer than the library's own texts is not one it handed out.
bool scanned(int got, int expected, const EventValues& v) {
    if (got == expected && strnlen(v.id, ZMF_JSON_TEXT_SIZE) < ZMF_JSON_TEXT_SIZE) return true;
    LOGE("scanf json failed");
    return false;
}

bool scanEvent(int event, const char* json, EventValues& v) {
    switch (event) {
        case kCaptureStarted:
        case kCaptureSize:
            return scanned(Zmf_ScanfJson(json, kTemplateCapture, v.id, &v.width, &v.height,
                                         &v.frameRate), 4, v);
        case kCaptureStopped:
            return scanned(Zmf_ScanfJson(json, kTemplateCaptureId, v.id), 1, v);
        case kCaptureFace:
            return scanned(Zmf_ScanfJson(json, kTemplateCaptureFace, v.id, &v.face, &v.width,
                                         &v.height), 4, v);
        case kRenderAdded:
            return scanned(Zmf_ScanfJson(json, kTemplateRender, v.id, &v.sourceType, &v.width,
                                         &v.height), 4, v);
        case kRenderStarted:
        case kRenderSizeA:
        case kRenderSize:
            return scanned(Zmf_ScanfJson(json, kTemplateRenderWindowSize, v.id, &v.sourceType,
                                         &v.window, &v.width, &v.height), 5, v);
        case kRenderRemoved:
            return scanned(Zmf_ScanfJson(json, kTemplateRenderWindow, v.id, &v.sourceType,
                                         &v.window), 3, v);
        default:
            return false;
    }
}

}  // namespace

std::atomic<ZmfEventObserver*> m_pZmfEventObserver{nullptr};

namespace {

ObserverCalls& observerCalls() {
    // The listener thread may still call while the process exits.
    static auto* calls = new ObserverCalls();
    return *calls;
}

}  // namespace

void zmfInitialize() {
    LOGI("%s", "zmfInitialize");
    if (__atomic_load_n(&_zmf, __ATOMIC_ACQUIRE) != 0) return;
    Zmf_OnIntialize();
    Zmf_VideoSetListener(listen);
    __atomic_store_n(&_zmf, 1, __ATOMIC_RELEASE);
}

int zmfTerminate() {
    LOGI("%s", "zmfTerminate");
    if (__atomic_load_n(&_zmf, __ATOMIC_ACQUIRE) != 0) {
        Zmf_VideoSetListener(nullptr);
        Zmf_OnTerminate();
        __atomic_store_n(&_zmf, 0, __ATOMIC_RELEASE);
    }
    return 0;
}

int registerZmfEventObserver(ZmfEventObserver* observer) {
    LOGI("registerZmfEventObserver ");
    m_pZmfEventObserver = observer;
    return 0;
}

void unregisterZmfEventObserver(ZmfEventObserver* observer) {
    observerCalls().unregister(m_pZmfEventObserver, observer);
}

void listen(int event, const char* json, int /*arg*/) {
    LOGI("%s, Evt:%s=%s", "listen", Zmf_GetEventName(event), json != nullptr ? json : "(null)");
    if (event < kFirstEvent || event > kLastEvent) return;
    if (event == kNotScanned1 || event == kNotScanned2) return;
    if (json == nullptr) {
        LOGE("scanf json failed");
        return;
    }
    EventValues v(json);
    if (!scanEvent(event, json, v)) return;

    ObserverCalls::Call call(observerCalls());
    ZmfEventObserver* observer = m_pZmfEventObserver.load();
    if (observer == nullptr) return;
    switch (event) {
        case kCaptureStarted:
        case kCaptureSize:
            observer->zmfCaptureEvtUpdate(event, v.id, v.width, v.height, v.frameRate);
            break;
        case kRenderStarted:
            observer->zmfRenderEvtUpdate(event, v.id, v.sourceType, v.width, v.height);
            break;
        case kRenderSizeA:
        case kRenderSize:
            // Both report the render's size; the engine knows them as one event.
            observer->zmfRenderEvtUpdate(kRenderSize, v.id, v.sourceType, v.width, v.height);
            break;
        default:
            break;
    }
}

}  // namespace android
