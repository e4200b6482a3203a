// The media engine's video events fired from its own threads: every name in
// the log, the four kinds forwarded to Java with the words they carry, the
// codec cache, the state before sysInit, and the RTP stream events that go
// to the engine and from there to the client.
#include <android/log.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "EngineHarness.h"
#include "HostFakes.h"
#include "JvmHarness.h"
#include "MmeJni.h"

using namespace jvmtest;
using ::testing::ElementsAre;
using ::testing::StartsWith;
using V = std::vector<std::string>;

namespace {

const char* const kNames[] = {
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
constexpr int kCapSize = 6, kCodecChanged = 7, kOrientation = 17, kRtpFirstPacket = 21, kRtpBreak = 22,
              kRtpReceived = 23, kMagnView = 28;

bool forwarded(int event) {
    return event == kCapSize || event == kCodecChanged || event == kOrientation || event == kMagnView ||
           (event >= kRtpFirstPacket && event <= kRtpReceived);
}

std::vector<std::string> eventLines(const V& lines) {
    V out;
    for (const std::string& line : lines) {
        if (line.rfind("Mvd_EvntProc event ", 0) == 0) out.push_back(line);
    }
    return out;
}

tagMVD_EVNT codecEvent(uint32_t first, uint32_t second) {
    tagMVD_EVNT event = mvdEvent(kCodecChanged);
    event.aiWord[7] = static_cast<int>(first);
    event.aiWord[8] = static_cast<int>(second);
    return event;
}

class MmeVideoEventTest : public JvmCase {
protected:
    void SetUp() override {
        JvmCase::SetUp();
        load();
    }
    void startBridge() {
        ASSERT_EQ(0, mme("sysInit", "()I"));
        log.clear();
    }
    static std::vector<jlong> codecCache() {
        Local<jlongArray> out = newLongArray(16, -1);
        EXPECT_EQ(0, mme("captureStatistics", "(JJ[J)I", {J(0), J(0), L(out)}));
        const std::vector<jlong> all = elements(out);
        return {all[14], all[15]};
    }
};

}  // namespace

TEST_F(MmeVideoEventTest, EveryEventIsLoggedByItsName) {
    startBridge();
    V expected;
    for (int event = 0; event < 32; ++event) {
        const int result = hostfakes::fireMvdEvent(mvdEvent(event));
        expected.push_back(std::string("Mvd_EvntProc event ") + kNames[event]);
        if (!forwarded(event)) {
            EXPECT_EQ(event, result) << kNames[event];
        }
    }
    for (int event : {32, 40, -1}) {
        EXPECT_EQ(event, hostfakes::fireMvdEvent(mvdEvent(event)));
        expected.push_back("Mvd_EvntProc event UNKNOWN");
    }
    EXPECT_EQ(expected, eventLines(bridgeLines(log)));
    // Only capture size, codec, orientation and view events reach Java.
    const V calls = upcalls();
    ASSERT_EQ(4u, calls.size());
    EXPECT_THAT(calls[0], StartsWith("mvdCaptureSizeChanged("));
    EXPECT_THAT(calls[1], StartsWith("mvdCodecChanged("));
    EXPECT_THAT(calls[2], StartsWith("mvdImgOrntChanged("));
    EXPECT_THAT(calls[3], StartsWith("mvdMagnViewChanged("));
}

TEST_F(MmeVideoEventTest, SizeOrientationAndViewReachJavaWithTheirWords) {
    startBridge();
    setUpcallResult(5);  // discarded: these events answer 0
    EXPECT_EQ(0, hostfakes::fireMvdEvent(mvdEvent(kCapSize)));
    EXPECT_EQ(0, hostfakes::fireMvdEvent(mvdEvent(kOrientation)));
    EXPECT_EQ(0, hostfakes::fireMvdEvent(mvdEvent(kMagnView)));
    const V calls = upcalls();
    EXPECT_THAT(calls, ElementsAre(onAttachedThread("mvdCaptureSizeChanged(109, 110)"),
                                   onAttachedThread("mvdImgOrntChanged(103, 104, 105)"),
                                   onAttachedThread("mvdMagnViewChanged(106)")));
    for (const std::string& call : calls) EXPECT_FALSE(javaThreadAlive(threadOf(call))) << call;
    EXPECT_EQ((V{"Mvd_EvntProc event EN_MVD_EVNT_CAP_SIZE", "JniMvdCapSizeChanged",
                 "Mvd_EvntProc event EN_MVD_EVNT_RENDER_ORNT_CHGED", "JniMvdImgOrntChanged",
                 "Mvd_EvntProc event EN_MVD_EVNT_STRM_RTPEXT_APP", "JniMvdMagnViewChanged"}),
              bridgeLines(log));
}

TEST_F(MmeVideoEventTest, CodecChangeAnswersWhatJavaAnswersAndIsCached) {
    startBridge();
    setUpcallResult(42);
    EXPECT_EQ(42, hostfakes::fireMvdEvent(codecEvent(96, 1)));
    EXPECT_THAT(upcalls(), ElementsAre(onAttachedThread("mvdCodecChanged(96, 1)")));
    EXPECT_EQ((std::vector<jlong>{96, 1}), codecCache());
    EXPECT_EQ((V{"Mvd_EvntProc event EN_MVD_EVNT_CODEC_CHANGED", "JniMvdCodecChanged", "captureStatistics"}),
              bridgeLines(log));

    // Java sees unsigned values as longs with zero high bits; the cache
    // reports the 32-bit words sign-extended.
    clearUpcalls();
    setUpcallResult(0);
    EXPECT_EQ(0, hostfakes::fireMvdEvent(codecEvent(0x80000001u, 0xFFFFFFFFu)));
    EXPECT_THAT(upcalls(), ElementsAre(onAttachedThread("mvdCodecChanged(2147483649, 4294967295)")));
    EXPECT_EQ((std::vector<jlong>{-2147483647, -1}), codecCache());
}

TEST_F(MmeVideoEventTest, BeforeSysInitEventsOnlyLogAndCache) {
    JVM_REQUIRE_FRESH_PROCESS();
    const std::vector<int> results = onNativeThread([] {
        std::vector<int> out;
        for (int event : {kCapSize, kOrientation, kMagnView}) {
            tagMVD_EVNT record = mvdEvent(event);
            out.push_back(android::Mvd_EvntProc(&record, 0));
        }
        tagMVD_EVNT codec = codecEvent(5, 2);
        out.push_back(android::Mvd_EvntProc(&codec, 0));
        return out;
    });
    EXPECT_EQ((std::vector<int>{0, 0, 0, 0}), results);
    EXPECT_TRUE(upcalls().empty());
    EXPECT_EQ((std::vector<jlong>{5, 2}), codecCache());
    EXPECT_EQ((V{"Mvd_EvntProc event EN_MVD_EVNT_CAP_SIZE", "JniMvdCapSizeChanged",
                 "Mvd_EvntProc event EN_MVD_EVNT_RENDER_ORNT_CHGED", "JniMvdImgOrntChanged",
                 "Mvd_EvntProc event EN_MVD_EVNT_STRM_RTPEXT_APP", "JniMvdMagnViewChanged",
                 "Mvd_EvntProc event EN_MVD_EVNT_CODEC_CHANGED", "JniMvdCodecChanged", "captureStatistics"}),
              bridgeLines(log));
}

TEST_F(MmeVideoEventTest, RtpStreamEventsGoToTheEngineAndOnToTheClient) {
    JVM_REQUIRE_FRESH_PROCESS();
    startBridge();
    // No engine yet, so nobody observes: the event number comes back.
    for (int event : {kRtpFirstPacket, kRtpBreak, kRtpReceived}) {
        EXPECT_EQ(event, hostfakes::fireMvdEvent(mvdEvent(event)));
    }

    ASSERT_EQ(2, vceServiceInit());
    android::sp<hostbinder::RemoteBinder> client = enginetest::remoteCallback();
    ASSERT_EQ(0, sendToService(2, {}, client));
    log.clear();
    EXPECT_EQ(0, hostfakes::fireMvdEvent(mvdEvent(kRtpBreak)));
    EXPECT_EQ(0, hostfakes::fireMvdEvent(mvdEvent(kRtpReceived)));
    EXPECT_EQ(0, hostfakes::fireMvdEvent(mvdEvent(kRtpFirstPacket)));
    EXPECT_EQ((V{"code 0: 14", "code 0: 15"}), received(*client));
    EXPECT_TRUE(log.contains(ANDROID_LOG_INFO, "VideoCallEngineImpl", "mmeEvtUpdate evt: 21"));
    EXPECT_TRUE(upcalls().empty()) << "stream events do not go to Java";

    // With the client's callback cleaned, the engine drops the event.
    ASSERT_EQ(0, sendToService(3));
    EXPECT_EQ(0, hostfakes::fireMvdEvent(mvdEvent(kRtpBreak)));
    EXPECT_TRUE(log.contains(ANDROID_LOG_INFO, "VideoCallEngineImpl", "notifyCallback null"));
    EXPECT_EQ(2u, client->transactionCount());
}
