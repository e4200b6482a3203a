// The media engine's video events: named and logged, four kinds forwarded to
// Mme's static Java methods, the RTP stream events to the engine.
#include <android/log.h>

#include "MmeEventObserver.h"
#include "MmeJni.h"

namespace android {

namespace {

#define LOGI(...) __android_log_print(ANDROID_LOG_INFO, kMmeNativeTag, __VA_ARGS__)
#define LOGE(...) __android_log_print(ANDROID_LOG_ERROR, kMmeNativeTag, __VA_ARGS__)

constexpr const char* kEventNames[] = {
        "EN_MVD_EVNT_DEV_CHGED",          "EN_MVD_EVNT_DEV_INVALID",
        "EN_MVD_EVNT_CAM_DISCONNED",      "EN_MVD_EVNT_CAP_ERR",
        "EN_MVD_EVNT_CAP_FREEZE",         "EN_MVD_EVNT_CAP_FRAMERATE",
        "EN_MVD_EVNT_CAP_SIZE",           "EN_MVD_EVNT_CODEC_CHANGED",
        "EN_MVD_EVNT_CODEC_KEY_REQ",      "EN_MVD_EVNT_FILE_PLAY_BEGIN",
        "EN_MVD_EVNT_FILE_PLAY_ENDED",    "EN_MVD_EVNT_STAT_INCOMING",
        "EN_MVD_EVNT_STAT_OUTGOING",      "EN_MVD_EVNT_STAT_PROTECTION",
        "EN_MVD_EVNT_STAT_CPULOAD",       "EN_MVD_EVNT_STAT_ENCODESIZE",
        "EN_MVD_EVNT_STAT_CAM_OVERUSE",   "EN_MVD_EVNT_RENDER_ORNT_CHGED",
        "EN_MVD_EVNT_RENDER_ORNT_SUPT",   "EN_MVD_EVNT_RENDER_FRAMERATE",
        "EN_MVD_EVNT_RENDER_STARTED",     "EN_MVD_EVNT_STRM_RTP_FIRST_PKT",
        "EN_MVD_EVNT_STRM_RTP_BREAK",     "EN_MVD_EVNT_STRM_RTP_RECVED",
        "EN_MVD_EVNT_STRM_RTP_KEEPALIVE_RECVED", "EN_MVD_EVNT_STRM_RTCP_BREAK",
        "EN_MVD_EVNT_STRM_RTCP_APP",      "EN_MVD_EVNT_STRM_NETW_STATUS",
        "EN_MVD_EVNT_STRM_RTPEXT_APP",    "EN_MVD_EVNT_STRM_FIR_REQ",
        "EN_MVD_EVNT_STRM_RTCP_RR",       "EN_MVD_EVNT_USER",
};
constexpr int kEventCount = static_cast<int>(sizeof(kEventNames) / sizeof(kEventNames[0]));
static_assert(kEventCount == 32, "one name per video event");

enum MvdEvent {
    EN_MVD_EVNT_CAP_SIZE = 6,
    EN_MVD_EVNT_CODEC_CHANGED = 7,
    EN_MVD_EVNT_RENDER_ORNT_CHGED = 17,
    EN_MVD_EVNT_STRM_RTP_FIRST_PKT = 21,
    EN_MVD_EVNT_STRM_RTP_BREAK = 22,
    EN_MVD_EVNT_STRM_RTP_RECVED = 23,
    EN_MVD_EVNT_STRM_RTPEXT_APP = 28,
};

// Words of the event record that carry each event's values.
enum EventWord {
    kWordEvent = 0,
    kWordOrient1 = 3,
    kWordOrient2 = 4,
    kWordOrient3 = 5,
    kWordMagnView = 6,
    kWordCodec1 = 7,
    kWordCodec2 = 8,
    kWordCapWidth = 9,
    kWordCapHeight = 10,
};
static_assert(static_cast<int>(kWordCapHeight) < static_cast<int>(MVD_EVNT_WORDS), "the record holds every word read");

uint32_t word(const tagMVD_EVNT& event, EventWord w) { return static_cast<uint32_t>(event.aiWord[w]); }

}  // namespace

const char* Mme_GetMvdEventName(int event) {
    return event >= 0 && event < kEventCount ? kEventNames[event] : "UNKNOWN";
}

int JniMvdCapSizeChanged(uint32_t width, uint32_t height) {
    LOGI("%s", "JniMvdCapSizeChanged");
    mmeUpcall(mvdCapSizeChanged, "JniMvdCapSizeChanged", static_cast<jint>(width),
              static_cast<jint>(height));
    return 0;
}

int JniMvdCodecChanged(uint32_t value1, uint32_t value2) {
    LOGI("%s", "JniMvdCodecChanged");
    m_lastCodecChange[0] = value1;
    m_lastCodecChange[1] = value2;
    return mmeUpcall(mvdCodecChanged, "JniMvdCodecChanged", static_cast<jlong>(value1),
                     static_cast<jlong>(value2));
}

int JniMvdImgOrntChanged(uint32_t value1, uint32_t value2, uint32_t value3) {
    LOGI("%s", "JniMvdImgOrntChanged");
    mmeUpcall(mvdImgOrntChanged, "JniMvdImgOrntChanged", static_cast<jint>(value1),
              static_cast<jint>(value2), static_cast<jint>(value3));
    return 0;
}

int JniMvdMagnViewChanged(uint32_t value) {
    LOGI("%s", "JniMvdMagnViewChanged");
    mmeUpcall(mvdMagnViewChanged, "JniMvdMagnViewChanged", static_cast<jint>(value));
    return 0;
}

extern "C" int Mvd_EvntProc(tagMVD_EVNT* event, unsigned int /*cookie*/) {
    if (event == nullptr) {
        LOGE("%s, no event record", "Mvd_EvntProc");
        return 0;
    }
    const int number = event->aiWord[kWordEvent];
    LOGI("%s event %s", "Mvd_EvntProc", Mme_GetMvdEventName(number));
    switch (number) {
        case EN_MVD_EVNT_CAP_SIZE:
            return JniMvdCapSizeChanged(word(*event, kWordCapWidth), word(*event, kWordCapHeight));
        case EN_MVD_EVNT_CODEC_CHANGED:
            return JniMvdCodecChanged(word(*event, kWordCodec1), word(*event, kWordCodec2));
        case EN_MVD_EVNT_RENDER_ORNT_CHGED:
            return JniMvdImgOrntChanged(word(*event, kWordOrient1), word(*event, kWordOrient2),
                                        word(*event, kWordOrient3));
        case EN_MVD_EVNT_STRM_RTP_FIRST_PKT:
        case EN_MVD_EVNT_STRM_RTP_BREAK:
        case EN_MVD_EVNT_STRM_RTP_RECVED:
            // Handled answers 0, as for the other forwarded events.
            return forwardMmeEvent(number) ? 0 : number;
        case EN_MVD_EVNT_STRM_RTPEXT_APP:
            return JniMvdMagnViewChanged(word(*event, kWordMagnView));
        default:
            return number;
    }
}

}  // namespace android
