// A call: the client drives the engine through the service while the modem
// starts and ends the call's RTP stream on the engine's pipe. The checks are
// what the camera, the capture size and the still image do to the call's
// stream; the stream's own set-up and end are the link's tests' part, and
// the simulator's call scenario plays a whole call end to end.
#include "EngineTestUtil.h"

using namespace enginecase;

namespace {

constexpr const char* kImage = "/data/vce/hold.png";
const std::string kVga30 = "br=600000 fps=30 480x640";
const std::string kQvga15 = "br=256000 fps=15 240x320";

// A new capture size changes the stream's codec, with the call's streams
// suspended meanwhile.
Strings codecChange(const std::string& from, const std::string& to) {
    return {"Mvd_GetCdc(1, \"H264\", {pt=96 " + from + "}) = 0", "Mvd_SuspendAllStrm() = 0",
            "Mvd_SetCdc(1, {pt=96 " + to + "}) = 0", "Mvd_ResumeAllStrm() = 0"};
}
std::string attached(const char* capture) { return "Mvd_CaptureAttach(1, " + quoted(capture) + ") = 0"; }

class CallTest : public EngineCase {};

}  // namespace

TEST_F(CallTest, TheStreamFollowsTheCameraTheSizeAndTheImage) {
    // The stream takes the size and the capture of the last capture started;
    // a size chosen while the camera is closed is stored, not yet told to it.
    EXPECT_EQ(0, setCamera(1));
    EXPECT_EQ(0, setCamera(-1));
    send(kEngineInit, {0});
    setSize(3);
    ASSERT_NO_FATAL_FAILURE(startStream(2));
    EXPECT_TRUE(inOrder(newCalls(), {"Mvd_SetCdc(1, {pt=96 " + kVga30 + "}) = 0", attached(kFront)}));

    // Opening a camera brings the stored size to the stream, then the capture.
    EXPECT_EQ(plus(codecChange(kVga30, kQvga15), {openText(0, kFirstHandle + 1, 240, 320, 15),
                                                  "camdrvOrientAngle(0) = 0", attached(kBack)}),
              callsOf([&] { EXPECT_EQ(0, setCamera(0)); }));
    // So does a new size for the open capture.
    EXPECT_EQ(plus(codecChange(kQvga15, kVga30), {"camdrvResize(257, 480, 640, 30) = 0"}),
              callsOf([&] { setSize(2); }));
    EXPECT_EQ((Strings{"Mvd_FileStartSendImage(1, " + quoted(kImage) + ") = 0"}),
              callsOf([&] { hide(kImage); }));
    EXPECT_EQ((Strings{"Mvd_FileStopSendImage(1) = 0"}), callsOf([&] { show(); }));

    // Closing the camera leaves the stream with its capture; a new camera replaces it, once.
    markCalls();
    EXPECT_EQ(0, setCamera(-1));
    EXPECT_TRUE(newCallsOf("Mvd_CaptureAttach").empty());
    EXPECT_EQ(0, setCamera(1));
    EXPECT_EQ((Strings{attached(kFront)}), newCallsOf("Mvd_CaptureAttach"));
    endStream(2, 1);
    EXPECT_TRUE(hostfakes::openMvdStreams().empty());
}
