// Loopback mode: the engine's own stream to 127.0.0.1, how it is built, how
// the camera, the capture size, the still image and release act on it, and a
// media engine that refuses parts of it.
#include "EngineTestUtil.h"

using namespace enginecase;
using Strings = std::vector<std::string>;

namespace {

constexpr const char* kImage = "/data/vce/hold.png";
constexpr const char* kVga30Codec = "{pt=121 br=600000 fps=30 480x640}";
constexpr const char* kQvga15Codec = "{pt=121 br=600000 fps=15 240x320}";

// What building loopback stream `id` sends the media engine.
Strings loopbackStart(unsigned int id, const std::string& codec) {
    const std::string s = std::to_string(id);
    return {
            "Mvd_Open(\"127.0.0.1\", 5060, out=" + s + ") = 0",
            "Mvd_SetRmtAddr(" + s + ", \"127.0.0.1\", 5060) = 0",
            "Mvd_SetUniqueName(" + s + ", \"Remote\") = 0",
            "Mvd_ArsSetEnable(" + s + ", 1) = 0",
            "Mvd_ArsSetParm(" + s + ", 500000, 1200000, 20, 30) = 0",
            "Mvd_GetCdc(" + s + ", \"H264\", {pt=0 br=0 fps=0 0x0}) = 0",
            "Mvd_SetCdc(" + s + ", " + codec + ") = 0",
            "Mvd_RedSetEnable(" + s + ", 0) = 0",
            "Mvd_SetSendPayload(" + s + ", 121) = 0",
            "Mvd_TptSetSend(" + s + ", 1) = 0",
            "Mvd_TptSetRecv(" + s + ", 1) = 0",
            "Mvd_RtpSetExt(" + s + ", 2, 1) = 0",
            "Mvd_ProcStart(" + s + ") = 0",
    };
}

Strings plus(Strings calls, std::initializer_list<std::string> more) {
    calls.insert(calls.end(), more);
    return calls;
}

std::string attached(unsigned int id, const char* capture) {
    return "Mvd_CaptureAttach(" + std::to_string(id) + ", " + quoted(capture) + ") = 0";
}

class LoopbackTest : public EngineCase {
protected:
    void startLoopback() { send(kEngineInit, {1}); }
    Strings newMediaEngineCalls() const {
        Strings out;
        for (const std::string& text : newCalls()) {
            if (text.compare(0, 4, "Mvd_") == 0) out.push_back(text);
        }
        return out;
    }
};

}  // namespace

TEST_F(LoopbackTest, InitBuildsTheStreamWithTheDefaultCameraSize) {
    hostfakes::setNextMvdStreamId(7);
    startLoopback();
    EXPECT_EQ(loopbackStart(7, kVga30Codec), newCalls());
    EXPECT_EQ((Strings{"init, loopback? 1 E", "startLoopBack", "getCameraSizeFromQos, no QOS seted",
                       "init, loopback? 1 X"}),
              engineLines());
    // The words the engine does not own come back as the media engine gave them.
    tagMVD_CODEC codec{};
    ASSERT_TRUE(hostfakes::getMvdCodec(7, &codec));
    for (int i = 0; i < MVD_CODEC_WORDS; ++i) {
        if (i == MVD_CODEC_WORD_PAYLOAD || i == MVD_CODEC_WORD_BITRATE || i == MVD_CODEC_WORD_FRAMERATE ||
            i == MVD_CODEC_WORD_WIDTH || i == MVD_CODEC_WORD_HEIGHT) {
            continue;
        }
        EXPECT_EQ(1000 + i, codec.aiWord[i]) << "word " << i;
    }
    EXPECT_EQ(std::vector<unsigned int>{7}, hostfakes::openMvdStreams());

    // The stream fixed the size: asking for the same one changes nothing.
    markCalls();
    setSize(2);
    EXPECT_TRUE(newCalls().empty());
    EXPECT_FALSE(logged("setCameraPreviewSize, update -1 -> 2"));
}

TEST_F(LoopbackTest, CaptureIsAttachedWhicheverStartsFirst) {
    startLoopback();
    markCalls();
    EXPECT_EQ(0, setCamera(1));
    EXPECT_EQ((Strings{openText(1, kFirstHandle, 480, 640, 30), "camdrvOrientAngle(0) = 0",
                       attached(1, kFront)}),
              newCalls());

    // A camera open before the stream is attached as its last step.
    send(kRelease);
    send(kEngineInit, {0});
    EXPECT_EQ(0, setCamera(0));
    markCalls();
    startLoopback();
    EXPECT_EQ(plus(loopbackStart(2, kVga30Codec), {attached(2, kBack)}), newCalls());
}

TEST_F(LoopbackTest, NewSizeRebuildsTheStream) {
    startLoopback();
    EXPECT_EQ(0, setCamera(1));
    markCalls();
    const size_t lines = engineLines().size();
    setSize(3);
    Strings expected{"camdrvResize(256, 240, 320, 15) = 0", "Mvd_ProcStop(1) = 0", "Mvd_Close(1) = 0"};
    for (const std::string& call : loopbackStart(2, kQvga15Codec)) expected.push_back(call);
    expected.push_back(attached(2, kFront));
    EXPECT_EQ(expected, newCalls());
    EXPECT_TRUE(inOrder(engineLinesSince(lines),
                        {"setCameraPreviewSize, update 2 -> 3", "restartCapture, new_size:3", "stopLoopBack",
                         "startLoopBack"}));
    EXPECT_EQ(std::vector<unsigned int>{2}, hostfakes::openMvdStreams());

    markCalls();
    setSize(9);  // folds to 3, the size in use
    EXPECT_TRUE(newCalls().empty());
    EXPECT_EQ(1u, log.count(ANDROID_LOG_INFO, kEngineTag, "stopLoopBack"));
}

TEST_F(LoopbackTest, ReleaseStopsTheStreamAfterRendersAndCamera) {
    const android::sp<hostbinder::RemoteBinder> client = setCallback();
    startLoopback();
    setSurface(kRemoteView);
    EXPECT_EQ(0, setCamera(1));
    setSurface(kLocalView);
    android::m_pMmeEventObserver.load()->mmeEvtUpdate(22);
    ASSERT_EQ(1u, client->transactionCount());

    markCalls();
    const size_t lines = engineLines().size();
    send(kRelease);
    settleRemovals();
    EXPECT_TRUE(inOrder(
            engineLinesSince(lines),
            {"release", "setRemoteSurface null", "removeRender", "setPreviewSurface null", "removeRender",
             "setCameraId -1, close camera", "stopCapture", "stopLoopBack", "release X"}));
    EXPECT_TRUE(inOrder(newCalls(), {"camdrvStop(256) = 0", "Mvd_ProcStop(1) = 0", "Mvd_Close(1) = 0"}));
    EXPECT_TRUE(called(removeText(kRemote)));
    EXPECT_TRUE(called(removeText(kFront)));
    EXPECT_TRUE(hostfakes::openMvdStreams().empty());
    EXPECT_TRUE(hostfakes::activeRenders().empty());

    // The callback was the last thing to go.
    android::m_pMmeEventObserver.load()->mmeEvtUpdate(22);
    EXPECT_EQ(1u, client->transactionCount());
    EXPECT_TRUE(logged("notifyCallback null"));
}

TEST_F(LoopbackTest, HiddenImageIsSentOnTheLoopbackStream) {
    startLoopback();
    markCalls();
    hide(kImage);
    EXPECT_EQ((Strings{"Mvd_FileStartSendImage(1, " + quoted(kImage) + ") = 0"}), newCalls());
    markCalls();
    show();
    EXPECT_EQ((Strings{"Mvd_FileStopSendImage(1) = 0"}), newCalls());
}

TEST_F(LoopbackTest, RefusalsByTheMediaEngine) {
    // No stream: nothing is configured on a stream that does not exist.
    failCalls("Mvd_Open", -1);
    startLoopback();
    EXPECT_EQ((Strings{"Mvd_Open(\"127.0.0.1\", 5060, out=0) = -1"}), newCalls());
    EXPECT_TRUE(logged("create stream failed", ANDROID_LOG_ERROR));
    EXPECT_TRUE(logged("init, loopback? 1 X"));
    hostfakes::clearResult("Mvd_Open");

    // An unreadable codec keeps the payload type 121 and leaves the size to
    // the camera; failing steps are logged and the rest still runs.
    failCalls("Mvd_GetCdc", -1);
    failCalls("Mvd_SetSendPayload", 1);
    failCalls("Mvd_ProcStart", 1);
    markCalls();
    startLoopback();
    EXPECT_EQ((Strings{"Mvd_Open(\"127.0.0.1\", 5060, out=1) = 0",
                       "Mvd_SetRmtAddr(1, \"127.0.0.1\", 5060) = 0", "Mvd_SetUniqueName(1, \"Remote\") = 0",
                       "Mvd_ArsSetEnable(1, 1) = 0", "Mvd_ArsSetParm(1, 500000, 1200000, 20, 30) = 0",
                       "Mvd_GetCdc(1, \"H264\", out=-) = -1", "Mvd_RedSetEnable(1, 0) = 0",
                       "Mvd_SetSendPayload(1, 121) = 1", "Mvd_TptSetSend(1, 1) = 0",
                       "Mvd_TptSetRecv(1, 1) = 0", "Mvd_RtpSetExt(1, 2, 1) = 0", "Mvd_ProcStart(1) = 1"}),
              newCalls());
    EXPECT_TRUE(logged("SetSendPayload failed", ANDROID_LOG_ERROR));
    EXPECT_TRUE(logged("ProcStart failed", ANDROID_LOG_ERROR));
    EXPECT_FALSE(logged("getCameraSizeFromQos, no QOS seted"));
    EXPECT_EQ(1u, log.count(ANDROID_LOG_ERROR, kEngineTag, "create stream failed"));
}

TEST_F(LoopbackTest, InitClosesALoopbackStreamThePreviousCallLeftOpen) {
    startLoopback();
    markCalls();
    send(kEngineInit, {0});
    EXPECT_EQ((Strings{"Mvd_ProcStop(1) = 0", "Mvd_Close(1) = 0"}), newMediaEngineCalls());
    EXPECT_TRUE(logged("stopLoopBack"));
    EXPECT_TRUE(hostfakes::openMvdStreams().empty());

    // Out of loopback mode nothing reaches a loopback stream any more.
    markCalls();
    setSize(3);
    hide(kImage);
    EXPECT_EQ(0, setCamera(1));
    send(kRelease);
    EXPECT_TRUE(newMediaEngineCalls().empty());
}

TEST_F(LoopbackTest, AClosedOrMissingStreamIsNeverAddressed) {
    // Released twice (a client death after its own release): the closed id,
    // which the media engine may have handed on, is not closed again.
    startLoopback();
    send(kRelease);
    markCalls();
    send(kRelease);
    EXPECT_TRUE(newMediaEngineCalls().empty());

    // No stream was created: camera, image and release leave stream 0 alone.
    failCalls("Mvd_Open", -1);
    startLoopback();
    hostfakes::clearResult("Mvd_Open");
    markCalls();
    EXPECT_EQ(0, setCamera(1));
    hide(kImage);
    send(kRelease);
    EXPECT_TRUE(newMediaEngineCalls().empty());
}
