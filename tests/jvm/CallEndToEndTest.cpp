// One whole video call with every piece real but the closed libraries: the
// JVM loads the library and starts the media engine and the service, a client
// process drives the service over binder, the modem starts and ends the
// stream over the pipe (changes mid-call: the engine's own tests), the
// engines' threads report events, and the client's death ends the call.
#include "JvmHarness.h"
#include "VtspRecord.h"

using namespace jvmtest;
using namespace vtspcodec;

namespace {

constexpr uint32_t kSetSurface = 1, kSetCallback = 2, kEngineInit = 4, kCameraId = 9;
constexpr const char* kFront = "Camera 1, Facing front, Orientation 270";
const char* const kRemoteSize =
        "{\"Render\":\"Remote\",\"SourceType\":0,\"Window\":1,\"Width\":640,\"Height\":480}";

// Sends one record from the modem and waits until these calls have been
// recorded after it, in this order.
::testing::AssertionResult sendAndExpect(const android::VPR_Comm& record, std::initializer_list<std::string> expected) {
    const size_t mark = hostfakes::callCount();
    enginetest::modem().writeRecord(record);
    eventually([&] { return inOrder(hostfakes::callTextsSince(mark), expected); });
    return inOrder(hostfakes::callTextsSince(mark), expected);
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

using CallEndToEndTest = JvmCase;

}  // namespace

TEST_F(CallEndToEndTest, AWholeCallFromLoadToTheClientsDeath) {
    JVM_REQUIRE_FRESH_PROCESS();
    ModemPty& modem = enginetest::modem();

    // The application starts the media engine and the service.
    load();
    ASSERT_EQ(0, mme("cfgSetWorkDir", "(Ljava/lang/String;)I", {L(newString(u"/data/vce"))}));
    ASSERT_EQ(0, mme("sysInit", "()I"));
    ASSERT_EQ(2, vceServiceInit());

    // The IMS client finds the service, hands over its callback, its two
    // views and the front camera (what the engine makes of each: its own
    // tests).
    android::sp<hostbinder::RemoteBinder> client = enginetest::remoteCallback();
    ASSERT_EQ(0, sendToService(kSetCallback, {}, client));
    ASSERT_EQ(0, sendToService(kEngineInit, {0}));
    ASSERT_EQ(0, sendToService(kSetSurface, {0}, enginetest::remoteProducer()));
    ASSERT_EQ(0, sendToService(kSetSurface, {1}, enginetest::remoteProducer()));
    ASSERT_EQ(0, sendToService(kCameraId, {1}));

    // The modem starts the stream and gets its bind request back.
    EXPECT_TRUE(sendAndExpect(
            stream(android::_VTSP_CMD_STREAM_VIDEO_START),
            {"Mvd_Open(\"10.0.0.1\", 6000, out=1) = 0", "Mvd_SetRmtAddr(1, \"192.168.1.2\", 5000) = 0",
             "Mvd_SetUniqueName(1, \"Remote\") = 0", "Mvd_ProcStart(1) = 0",
             std::string("Mvd_CaptureAttach(1, \"") + kFront + "\") = 0"}));
    android::VPR_Comm reply{};
    ASSERT_TRUE(modem.readRecord(&reply)) << "no bind request on the pipe";
    EXPECT_EQ(1, readBindRequest(reply).streamId);  // (its other fields: the link's own tests)

    // Events from the video library's and the media engine's threads reach
    // the client (the Java-bound ones: MmeVideoEventTest).
    ASSERT_TRUE(hostfakes::fireZmfEvent(27, kRemoteSize));
    for (int event : {22, 23}) EXPECT_EQ(0, hostfakes::fireMvdEvent(mvdEvent(event)));
    EXPECT_EQ((V{"code 1 flags 0: 11 640 480 0", "code 0 flags 0: 14", "code 0 flags 0: 15"}), received(*client));

    // The modem ends the stream.
    EXPECT_TRUE(sendAndExpect(stream(android::_VTSP_CMD_STREAM_VIDEO_END), {"Mvd_Close(1) = 0"}));

    // The client's process dies: the engine lets go of camera and views.
    client->kill();
    EXPECT_TRUE(log.contains(ANDROID_LOG_INFO, "VideoCallEngineService", "binderDied, ims app died"));
    EXPECT_TRUE(hostfakes::openCameras().empty());
    EXPECT_TRUE(eventually([] { return hostfakes::activeRenders().empty(); })) << "views still shown";

    EXPECT_EQ(0, mme("sysDestroy", "()I"));
}
