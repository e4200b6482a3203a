// Whole calls: the client drives the engine through the service while the
// modem starts and ends the call's RTP stream on the engine's pipe, and the
// media libraries report events. The checks follow the order in which the
// camera driver, the render library and the media engine are called.
#include "EngineTestUtil.h"

using namespace enginecase;
using Strings = std::vector<std::string>;

namespace {

constexpr const char* kImage = "/data/vce/hold.png";

std::string attached(const char* capture) { return "Mvd_CaptureAttach(1, " + quoted(capture) + ") = 0"; }

class CallTest : public EngineCase {
protected:
    static void mediaEngineEvent(int event) { android::m_pMmeEventObserver.load()->mmeEvtUpdate(event); }
};

}  // namespace

TEST_F(CallTest, ClientAndModemTogether) {
    const android::sp<hostbinder::RemoteBinder> client = setCallback();
    send(kEngineInit, {0});
    setSurface(kRemoteView);
    setSurface(kLocalView);
    EXPECT_EQ(0, setCamera(1));
    orient(90, 0, 1);
    send(kUplinkQos, {500});
    ASSERT_NO_FATAL_FAILURE(startStream(1));
    EXPECT_TRUE(inOrder(
            newCalls(),
            {renderAddText(kRemote), openText(1, kFirstHandle, 480, 640, 30), renderAddText(kFront),
             "camdrvOrientAngle(270) = 0", rotateText(kFront, 270), "Mvd_Open(\"10.0.0.1\", 6000, out=1) = 0",
             "Mvd_SetRmtAddr(1, \"192.168.1.2\", 5000) = 0", "Mvd_SetUniqueName(1, \"Remote\") = 0",
             "Mvd_SetCdc(1, {pt=96 br=600000 fps=30 480x640}) = 0", "Mvd_ProcStart(1) = 0",
             attached(kFront)}));
    // Auto-rotate stayed on: the remote view stays upright.
    EXPECT_EQ((Strings{rotateText(kRemote, 0), rotateText(kFront, 0), rotateText(kFront, 270)}),
              newCallsOf("renderRotate"));

    // The stream follows a camera switch.
    markCalls();
    EXPECT_EQ(0, setCamera(0));
    EXPECT_TRUE(inOrder(newCalls(), {"camdrvStop(256) = 0", openText(0, kFirstHandle + 1, 480, 640, 30),
                                     "camdrvOrientAngle(270) = 0", attached(kBack), renderAddText(kBack),
                                     rotateText(kBack, 270)}));
    EXPECT_EQ(1u, newCallsOf("Mvd_CaptureAttach").size());

    // A new size suspends the call's streams for the codec change and resizes the capture.
    markCalls();
    setSize(3);
    EXPECT_EQ((Strings{"Mvd_GetCdc(1, \"H264\", {pt=96 br=600000 fps=30 480x640}) = 0",
                       "Mvd_SuspendAllStrm() = 0", "Mvd_SetCdc(1, {pt=96 br=256000 fps=15 240x320}) = 0",
                       "Mvd_ResumeAllStrm() = 0", "camdrvResize(257, 240, 320, 15) = 0"}),
              newCalls());

    markCalls();
    hide(kImage);
    EXPECT_EQ((Strings{"Mvd_FileStartSendImage(1, " + quoted(kImage) + ") = 0"}), newCalls());

    // Events of the media libraries reach the client.
    client->clearTransactions();
    mediaEngineEvent(22);
    mediaEngineEvent(21);
    mediaEngineEvent(23);
    ASSERT_TRUE(hostfakes::fireZmfEvent(
            27, R"({"Render":"Remote","SourceType":0,"Window":4660,"Width":240,"Height":320})"));
    const auto sent = client->transactions();
    ASSERT_EQ(3u, sent.size());
    EXPECT_EQ(0u, sent[0].code);
    EXPECT_EQ((std::vector<int32_t>{14}), words(sent[0]));
    EXPECT_EQ(0u, sent[1].code);
    EXPECT_EQ((std::vector<int32_t>{15}), words(sent[1]));
    EXPECT_EQ(1u, sent[2].code);
    EXPECT_EQ((std::vector<int32_t>{11, 240, 320, 0}), words(sent[2]));
    EXPECT_TRUE(logged("mmeEvtUpdate evt: 21"));

    // The modem ends the stream; the client then releases the engine.
    markCalls();
    endStream(1, 1);
    EXPECT_EQ((Strings{"Mvd_CaptureDetach(1) = 0", "Mvd_ProcStop(1) = 0", "Mvd_Close(1) = 0"}), newCalls());
    EXPECT_EQ(0u, dispatcher().streamCount());

    markCalls();
    send(kRelease);
    settleRemovals();
    const Strings released = newCalls();
    EXPECT_TRUE(contains(released, "camdrvStop(257) = 0"));
    EXPECT_TRUE(contains(released, removeText(kRemote)));
    EXPECT_TRUE(contains(released, removeText(kBack)));
    EXPECT_TRUE(newCallsOf("Mvd_FileStopSendImage").empty());
    EXPECT_TRUE(hostfakes::openCameras().empty());
    EXPECT_TRUE(hostfakes::activeRenders().empty());
    EXPECT_TRUE(hostfakes::openMvdStreams().empty());
    EXPECT_EQ(0u, android::Surface::liveCount());

    const size_t told = client->transactionCount();
    mediaEngineEvent(22);
    EXPECT_EQ(told, client->transactionCount());
    EXPECT_TRUE(logged("notifyCallback null"));
}

TEST_F(CallTest, StreamStartedBeforeTheCameraTakesItsCaptureAndSize) {
    // The streams take the size of the last capture started; one chosen
    // while the camera is closed is stored, not yet told to them.
    EXPECT_EQ(0, setCamera(1));
    EXPECT_EQ(0, setCamera(-1));
    send(kEngineInit, {0});
    setSize(3);
    ASSERT_NO_FATAL_FAILURE(startStream(2));
    EXPECT_TRUE(
            inOrder(newCalls(), {"Mvd_SetCdc(1, {pt=96 br=600000 fps=30 480x640}) = 0", attached(kFront)}));

    markCalls();
    EXPECT_EQ(0, setCamera(0));
    EXPECT_EQ((Strings{"Mvd_GetCdc(1, \"H264\", {pt=96 br=600000 fps=30 480x640}) = 0",
                       "Mvd_SuspendAllStrm() = 0", "Mvd_SetCdc(1, {pt=96 br=256000 fps=15 240x320}) = 0",
                       "Mvd_ResumeAllStrm() = 0", openText(0, kFirstHandle + 1, 240, 320, 15),
                       "camdrvOrientAngle(0) = 0", attached(kBack)}),
              newCalls());

    // Closing the camera leaves the stream with its capture; a new camera replaces it.
    markCalls();
    EXPECT_EQ(0, setCamera(-1));
    EXPECT_TRUE(newCallsOf("Mvd_CaptureAttach").empty());
    EXPECT_EQ(0, setCamera(1));
    EXPECT_EQ((Strings{attached(kFront)}), newCallsOf("Mvd_CaptureAttach"));
    EXPECT_EQ(std::vector<unsigned int>{1}, hostfakes::openMvdStreams());

    endStream(2, 1);
    EXPECT_TRUE(hostfakes::openMvdStreams().empty());
}
