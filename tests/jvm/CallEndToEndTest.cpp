// One whole video call with every piece real but the closed libraries: the
// JVM loads the library and starts the media engine and the service, a client
// process drives the service over binder, the modem drives the streams over
// the pipe, the engines' threads report events, and the client's death ends
// the call.
#include <android/log.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <vector>

#include "EngineHarness.h"
#include "HostFakes.h"
#include "JvmHarness.h"
#include "VtspRecord.h"

using namespace jvmtest;
using namespace vtspcodec;
using ::testing::Contains;
using ::testing::IsSupersetOf;
using ::testing::MatchesRegex;
using V = std::vector<std::string>;

namespace {

constexpr uint32_t kSetSurface = 1, kSetCallback = 2, kEngineInit = 4, kCameraId = 9;
constexpr const char* kFront = "Camera 1, Facing front, Orientation 270";
const char* const kRemoteSize =
        "{\"Render\":\"Remote\",\"SourceType\":0,\"Window\":1,\"Width\":640,\"Height\":480}";

bool called(const std::string& call) {
    const V calls = hostfakes::callTexts();
    return std::find(calls.begin(), calls.end(), call) != calls.end();
}

// Waits until every call has been recorded, in this order, after `mark`.
::testing::AssertionResult callsInOrder(size_t mark, const V& expected) {
    V seen;
    const bool done = eventually([&] {
        seen = hostfakes::callTextsSince(mark);
        auto from = seen.begin();
        for (const std::string& call : expected) {
            from = std::find(from, seen.end(), call);
            if (from == seen.end()) return false;
            ++from;
        }
        return true;
    });
    if (done) return ::testing::AssertionSuccess();
    ::testing::AssertionResult failure = ::testing::AssertionFailure() << "calls missing or out of order in:";
    for (const std::string& call : seen) failure << "\n  " << call;
    return failure;
}

android::VPR_Comm stream(int32_t code, uint32_t dir = android::VTSP_STREAM_DIR_SENDRECV) {
    StreamCommand c;
    c.code = code;
    c.streamId = 1;
    c.dir = dir;
    c.localAddr = address("10.0.0.1", 6000);
    c.remoteAddr = address("192.168.1.2", 5000);
    c.localVideoAsBwKbps = 500;
    return streamRecord(c);
}

class CallEndToEndTest : public JvmCase {};

}  // namespace

TEST_F(CallEndToEndTest, AWholeCallFromLoadToTheClientsDeath) {
    JVM_REQUIRE_FRESH_PROCESS();
    ModemPty& modem = enginetest::modem();

    // The application starts the media engine and the service.
    load();
    ASSERT_EQ(0, mme("cfgSetWorkDir", "(Ljava/lang/String;)I", {L(newString(u"/data/vce"))}));
    ASSERT_EQ(0, mme("sysInit", "()I"));
    ASSERT_EQ(2, vceServiceInit());
    EXPECT_THAT(hostfakes::callTexts(),
                IsSupersetOf({"Zmf_OnIntialize() = 0", "renderInit() = 0",
                              "camdrvInit(\"com.tessaroval.vce\", 24, \"system/lib64\") = 0"}));

    // The IMS client finds the service, hands over its callback, its two
    // views and the front camera.
    android::sp<hostbinder::RemoteBinder> client = enginetest::remoteCallback();
    ASSERT_EQ(0, sendToService(kSetCallback, {}, client));
    ASSERT_EQ(0, sendToService(kEngineInit, {0}));
    ASSERT_EQ(0, sendToService(kSetSurface, {0}, enginetest::remoteProducer()));
    ASSERT_EQ(0, sendToService(kSetSurface, {1}, enginetest::remoteProducer()));
    ASSERT_EQ(0, sendToService(kCameraId, {1}));
    EXPECT_EQ(1u, hostfakes::openCameras().size());
    EXPECT_EQ((V{kFront, "Remote"}), hostfakes::activeRenders());
    EXPECT_THAT(hostfakes::callTexts(),
                Contains(MatchesRegex(std::string("camdrvOpen\\(\"") + kFront + "\", 1, .* = 256")));

    // The modem starts the stream and gets its bind request back.
    size_t mark = hostfakes::callCount();
    modem.writeRecord(stream(android::_VTSP_CMD_STREAM_VIDEO_START));
    android::VPR_Comm reply{};
    ASSERT_TRUE(modem.readRecord(&reply)) << "no bind request on the pipe";
    const BindRequest bind = readBindRequest(reply);
    EXPECT_EQ(android::VPR_NET_CMD_BIND, bind.code);
    EXPECT_EQ(1, bind.streamId);
    EXPECT_EQ("10.0.0.1", addressText(bind.addr));
    EXPECT_EQ(6000, bind.addr.port);
    EXPECT_EQ(1u, bind.targetModule);
    EXPECT_EQ(android::kVprCommSize, bind.recordLength);
    EXPECT_TRUE(callsInOrder(mark, {"Mvd_Open(\"10.0.0.1\", 6000, out=1) = 0",
                                    "Mvd_SetRmtAddr(1, \"192.168.1.2\", 5000) = 0",
                                    "Mvd_SetUniqueName(1, \"Remote\") = 0", "Mvd_ProcStart(1) = 0",
                                    std::string("Mvd_CaptureAttach(1, \"") + kFront + "\") = 0"}));

    // RTCP feedback, then a hold.
    mark = hostfakes::callCount();
    ConfigCommand feedback;
    feedback.data[1] = 1;
    feedback.data[2] = 0x30;
    modem.writeRecord(configRecord(feedback));
    EXPECT_TRUE(callsInOrder(mark, {"Mvd_SuspendAllStrm() = 0", "Mvd_TptEnableNack(1, 1) = 0",
                                    "Mvd_ResumeAllStrm() = 0"}));
    mark = hostfakes::callCount();
    modem.writeRecord(stream(android::_VTSP_CMD_STREAM_VIDEO_MODITY, android::_VTSP_STREAM_DIR_INACTIVE));
    EXPECT_TRUE(callsInOrder(mark, {"Mvd_ProcStop(1) = 0"}));

    // Events from the video library's and the media engine's threads.
    ASSERT_TRUE(hostfakes::fireZmfEvent(27, kRemoteSize));
    EXPECT_EQ(0, hostfakes::fireMvdEvent(mvdEvent(22)));
    EXPECT_EQ(0, hostfakes::fireMvdEvent(mvdEvent(23)));
    EXPECT_EQ((V{"code 1: 11 640 480 0", "code 0: 14", "code 0: 15"}), received(*client));
    setUpcallResult(1);
    EXPECT_EQ(1, hostfakes::fireMvdEvent(mvdEvent(7)));
    EXPECT_THAT(upcalls(), Contains(onAttachedThread("mvdCodecChanged(107, 108)")));

    // The modem ends the stream.
    mark = hostfakes::callCount();
    modem.writeRecord(stream(android::_VTSP_CMD_STREAM_VIDEO_END));
    EXPECT_TRUE(callsInOrder(mark, {"Mvd_Close(1) = 0"}));
    EXPECT_TRUE(hostfakes::openMvdStreams().empty());

    // The client's process dies: the engine lets go of camera and views.
    client->kill();
    EXPECT_TRUE(log.contains(ANDROID_LOG_INFO, "VideoCallEngineService", "binderDied, ims app died"));
    EXPECT_TRUE(hostfakes::openCameras().empty());
    EXPECT_TRUE(eventually([] { return hostfakes::activeRenders().empty(); })) << "views still shown";
    EXPECT_EQ(0, hostfakes::fireMvdEvent(mvdEvent(22)));
    EXPECT_TRUE(log.contains(ANDROID_LOG_INFO, "VideoCallEngineImpl", "notifyCallback null"));
    EXPECT_TRUE(called("camdrvStop(256) = 0"));

    EXPECT_EQ(0, mme("sysDestroy", "()I"));
}
