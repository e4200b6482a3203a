// The media engine's video events fired from its own threads: every name in
// the log, the four kinds forwarded to Java with the words they carry, the
// codec cache, the state before sysInit, and the RTP stream events that go
// to the engine and from there to the client.
#include <sstream>

#include "EngineHarness.h"
#include "JvmHarness.h"
#include "MmeJni.h"

using namespace jvmtest;
using ::testing::ElementsAre;

namespace {

// The names the log gives events 0 to 31, less their "EN_MVD_EVNT_" prefix.
const std::string kNames =
        "DEV_CHGED DEV_INVALID CAM_DISCONNED CAP_ERR CAP_FREEZE CAP_FRAMERATE CAP_SIZE CODEC_CHANGED "
        "CODEC_KEY_REQ FILE_PLAY_BEGIN FILE_PLAY_ENDED STAT_INCOMING STAT_OUTGOING STAT_PROTECTION "
        "STAT_CPULOAD STAT_ENCODESIZE STAT_CAM_OVERUSE RENDER_ORNT_CHGED RENDER_ORNT_SUPT RENDER_FRAMERATE "
        "RENDER_STARTED STRM_RTP_FIRST_PKT STRM_RTP_BREAK STRM_RTP_RECVED STRM_RTP_KEEPALIVE_RECVED "
        "STRM_RTCP_BREAK STRM_RTCP_APP STRM_NETW_STATUS STRM_RTPEXT_APP STRM_FIR_REQ STRM_RTCP_RR USER";
constexpr int kCapSize = 6, kCodecChanged = 7, kOrientation = 17, kRtpFirstPacket = 21, kRtpBreak = 22,
              kRtpReceived = 23, kMagnView = 28;

// The lines that name an event.
V eventLines(const V& lines) {
    V out;
    for (const std::string& line : lines) {
        if (line.rfind("Mvd_EvntProc event ", 0) == 0) out.push_back(line);
    }
    return out;
}

// What the bridge logs for the forwarded events (the codec cache is read
// back through captureStatistics).
const V kSizeOrientationViewLines = {
        "Mvd_EvntProc event EN_MVD_EVNT_CAP_SIZE",         "JniMvdCapSizeChanged",
        "Mvd_EvntProc event EN_MVD_EVNT_RENDER_ORNT_CHGED", "JniMvdImgOrntChanged",
        "Mvd_EvntProc event EN_MVD_EVNT_STRM_RTPEXT_APP",   "JniMvdMagnViewChanged"};
const V kCodecLines = {"Mvd_EvntProc event EN_MVD_EVNT_CODEC_CHANGED", "JniMvdCodecChanged",
                       "captureStatistics"};

tagMVD_EVNT codecEvent(uint32_t first, uint32_t second) {
    tagMVD_EVNT event = mvdEvent(kCodecChanged);
    event.aiWord[7] = static_cast<int>(first);
    event.aiWord[8] = static_cast<int>(second);
    return event;
}

// The codec words the statistics report carries last.
std::vector<jlong> codecCache() {
    const std::vector<jlong> all = captureStatistics(0);
    return {all[14], all[15]};
}

using MmeVideoEventTest = LoadedCase;

}  // namespace

TEST_F(MmeVideoEventTest, EveryEventIsLoggedByItsName) {
    startBridge();
    V expected;
    std::istringstream names(kNames);
    int event = 0;
    for (std::string name; names >> name; ++event) {
        // What Java handles answers Java's 0, the rest their number (the
        // stream events' answer depends on the engine: the case below).
        const bool toJava =
                event == kCapSize || event == kCodecChanged || event == kOrientation || event == kMagnView;
        const int result = hostfakes::fireMvdEvent(mvdEvent(event));
        if (event < kRtpFirstPacket || event > kRtpReceived) {
            EXPECT_EQ(toJava ? 0 : event, result) << name;
        }
        expected.push_back("Mvd_EvntProc event EN_MVD_EVNT_" + name);
    }
    ASSERT_EQ(32, event);
    for (int unknown : {32, 40, -1}) {
        EXPECT_EQ(unknown, hostfakes::fireMvdEvent(mvdEvent(unknown)));
        expected.push_back("Mvd_EvntProc event UNKNOWN");
    }
    EXPECT_EQ(expected, eventLines(bridgeLines(log)));
    // Only capture size, codec, orientation and view events reach Java (what
    // each carries: the cases below).
    EXPECT_EQ(4u, upcalls().size());
}

TEST_F(MmeVideoEventTest, SizeOrientationAndViewReachJavaWithTheirWords) {
    startBridge();
    setUpcallResult(5);  // discarded: these events answer 0
    for (int event : {kCapSize, kOrientation, kMagnView}) {
        EXPECT_EQ(0, hostfakes::fireMvdEvent(mvdEvent(event)));
    }
    EXPECT_THAT(upcalls(), ElementsAre(onAttachedThread("mvdCaptureSizeChanged(109, 110)"),
                                       onAttachedThread("mvdImgOrntChanged(103, 104, 105)"),
                                       onAttachedThread("mvdMagnViewChanged(106)")));
    EXPECT_EQ(kSizeOrientationViewLines, bridgeLines(log));
}

TEST_F(MmeVideoEventTest, CodecChangeAnswersWhatJavaAnswersAndIsCached) {
    startBridge();
    setUpcallResult(42);
    EXPECT_EQ(42, hostfakes::fireMvdEvent(codecEvent(96, 1)));
    EXPECT_THAT(upcalls(), ElementsAre(onAttachedThread("mvdCodecChanged(96, 1)")));
    EXPECT_EQ((std::vector<jlong>{96, 1}), codecCache());
    EXPECT_EQ(kCodecLines, bridgeLines(log));

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
        for (tagMVD_EVNT record :
             {mvdEvent(kCapSize), mvdEvent(kOrientation), mvdEvent(kMagnView), codecEvent(5, 2)}) {
            out.push_back(android::Mvd_EvntProc(&record, 0));
        }
        return out;
    });
    EXPECT_EQ((std::vector<int>{0, 0, 0, 0}), results);
    EXPECT_TRUE(upcalls().empty());
    EXPECT_EQ((std::vector<jlong>{5, 2}), codecCache());
    EXPECT_EQ(kSizeOrientationViewLines + kCodecLines, bridgeLines(log));
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
    for (int event : {kRtpBreak, kRtpReceived, kRtpFirstPacket}) {
        EXPECT_EQ(0, hostfakes::fireMvdEvent(mvdEvent(event)));
    }
    EXPECT_EQ((V{"code 0 flags 0: 14", "code 0 flags 0: 15"}), received(*client));
    EXPECT_TRUE(log.contains(ANDROID_LOG_INFO, "VideoCallEngineImpl", "mmeEvtUpdate evt: 21"));
    EXPECT_TRUE(upcalls().empty()) << "stream events do not go to Java";
}
