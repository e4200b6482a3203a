// Loopback mode: the engine's own stream to 127.0.0.1, how it is built, how
// the camera, the capture size, the still image and release act on it, and a
// media engine that refuses parts of it.
#include "EngineTestUtil.h"

using namespace enginecase;

namespace {

constexpr const char* kImage = "/data/vce/hold.png";

// What building loopback stream `id` sends the media engine. An empty codec:
// Mvd_GetCdc failed, so no codec is set.
Strings loopbackStart(unsigned int id, const std::string& codec, int payloadResult = 0, int startResult = 0) {
    const std::string s = std::to_string(id);
    Strings calls{"Mvd_Open(\"127.0.0.1\", 5060, out=" + s + ") = 0",
                  "Mvd_SetRmtAddr(" + s + ", \"127.0.0.1\", 5060) = 0",
                  "Mvd_SetUniqueName(" + s + ", \"Remote\") = 0", "Mvd_ArsSetEnable(" + s + ", 1) = 0",
                  "Mvd_ArsSetParm(" + s + ", 500000, 1200000, 20, 30) = 0"};
    if (codec.empty()) {
        calls.push_back("Mvd_GetCdc(" + s + ", \"H264\", out=-) = -1");
    } else {
        calls.push_back("Mvd_GetCdc(" + s + ", \"H264\", {pt=0 br=0 fps=0 0x0}) = 0");
        calls.push_back("Mvd_SetCdc(" + s + ", {pt=121 br=600000 " + codec + "}) = 0");
    }
    return plus(calls, {"Mvd_RedSetEnable(" + s + ", 0) = 0",
                        "Mvd_SetSendPayload(" + s + ", 121) = " + std::to_string(payloadResult),
                        "Mvd_TptSetSend(" + s + ", 1) = 0", "Mvd_TptSetRecv(" + s + ", 1) = 0",
                        "Mvd_RtpSetExt(" + s + ", 2, 1) = 0",
                        "Mvd_ProcStart(" + s + ") = " + std::to_string(startResult)});
}

std::string attached(unsigned int id, const char* capture) {
    return "Mvd_CaptureAttach(" + std::to_string(id) + ", " + quoted(capture) + ") = 0";
}

class LoopbackTest : public EngineCase {
protected:
    void startLoopback() { send(kEngineInit, {1}); }
    // The media engine calls of a step.
    template <typename Step>
    Strings mediaEngineCallsOf(Step step) {
        Strings out;
        for (const std::string& text : callsOf(step)) {
            if (text.compare(0, 4, "Mvd_") == 0) out.push_back(text);
        }
        return out;
    }
};

}  // namespace

TEST_F(LoopbackTest, InitBuildsTheStreamAndTheCaptureIsAttachedWhicheverStartsFirst) {
    startLoopback();
    EXPECT_EQ(loopbackStart(1, "fps=30 480x640"), newCalls());
    EXPECT_EQ((Strings{"init, loopback? 1 E", "startLoopBack", "getCameraSizeFromQos, no QOS seted",
                       "init, loopback? 1 X"}),
              engineLines());
    // The words the engine does not own come back as the media engine gave them.
    tagMVD_CODEC codec{};
    ASSERT_TRUE(hostfakes::getMvdCodec(1, &codec));
    for (int i = 0; i < MVD_CODEC_WORDS; ++i) {
        if (i == MVD_CODEC_WORD_PAYLOAD || i == MVD_CODEC_WORD_BITRATE || i == MVD_CODEC_WORD_FRAMERATE ||
            i == MVD_CODEC_WORD_WIDTH || i == MVD_CODEC_WORD_HEIGHT) {
            continue;
        }
        EXPECT_EQ(1000 + i, codec.aiWord[i]) << "word " << i;
    }
    // The stream fixed the size: asking for the same one changes nothing.
    EXPECT_TRUE(callsOf([&] { setSize(2); }).empty());
    EXPECT_FALSE(logged("setCameraPreviewSize, update -1 -> 2"));

    EXPECT_EQ((Strings{openText(1, kFirstHandle, 480, 640, 30), "camdrvOrientAngle(0) = 0",
                       attached(1, kFront)}),
              callsOf([&] { EXPECT_EQ(0, setCamera(1)); }));

    // A camera open before the stream is attached as its last step.
    send(kRelease);
    send(kEngineInit, {0});
    EXPECT_EQ(0, setCamera(0));
    EXPECT_EQ(plus(loopbackStart(2, "fps=30 480x640"), {attached(2, kBack)}),
              callsOf([&] { startLoopback(); }));
}

TEST_F(LoopbackTest, NewSizeRebuildsTheStream) {
    startLoopback();
    EXPECT_EQ(0, setCamera(1));
    const size_t lines = engineLines().size();
    const Strings expected =
            plus({"camdrvResize(256, 240, 320, 15) = 0", "Mvd_ProcStop(1) = 0", "Mvd_Close(1) = 0"},
                 plus(loopbackStart(2, "fps=15 240x320"), {attached(2, kFront)}));
    EXPECT_EQ(expected, callsOf([&] { setSize(3); }));
    EXPECT_TRUE(inOrder(engineLinesSince(lines),
                        {"setCameraPreviewSize, update 2 -> 3", "restartCapture, new_size:3", "stopLoopBack",
                         "startLoopBack"}));
    EXPECT_TRUE(callsOf([&] { setSize(9); }).empty());  // folds to 3, the size in use
}

TEST_F(LoopbackTest, ReleaseStopsTheStreamAfterRendersAndCamera) {
    const android::sp<hostbinder::RemoteBinder> client = setCallback();
    startLoopback();
    setSurface(kRemoteView);
    EXPECT_EQ(0, setCamera(1));
    setSurface(kLocalView);

    markCalls();
    const size_t lines = engineLines().size();
    send(kRelease);
    settleRemovals();
    EXPECT_TRUE(inOrder(
            engineLinesSince(lines),
            {"release", "setRemoteSurface null", "removeRender", "setPreviewSurface null", "removeRender",
             "setCameraId -1, close camera", "stopCapture", "stopLoopBack", "release X"}));
    EXPECT_TRUE(inOrder(newCalls(), {"camdrvStop(256) = 0", "Mvd_ProcStop(1) = 0", "Mvd_Close(1) = 0"}));

    // The callback was the last thing to go.
    mmeEvent(22);
    EXPECT_EQ(0u, client->transactionCount());
    EXPECT_TRUE(logged("notifyCallback null"));
}

TEST_F(LoopbackTest, TheImageGoesToTheLoopbackStreamUntilInitEndsTheModeAndReleaseClosesIt) {
    startLoopback();
    EXPECT_EQ((Strings{"Mvd_FileStartSendImage(1, " + quoted(kImage) + ") = 0"}),
              callsOf([&] { hide(kImage); }));
    EXPECT_EQ((Strings{"Mvd_FileStopSendImage(1) = 0"}), callsOf([&] { show(); }));

    // init(0) turns the mode off without touching the stream.
    EXPECT_TRUE(mediaEngineCallsOf([&] { send(kEngineInit, {0}); }).empty());
    EXPECT_EQ((Strings{"init, loopback? 0 E", "init, loopback? 0 X"}), engineLinesSince(engineLines().size() - 2));

    // Out of loopback mode nothing reaches the stream, until release stops and closes it, once.
    EXPECT_EQ((Strings{"Mvd_ProcStop(1) = 0", "Mvd_Close(1) = 0"}), mediaEngineCallsOf([&] {
                  setSize(3);
                  hide(kImage);
                  EXPECT_EQ(0, setCamera(1));
                  send(kRelease);
                  send(kRelease);
              }));

    // A loopback init over an open stream closes it before building the next.
    startLoopback();
    const Strings again = mediaEngineCallsOf([&] { startLoopback(); });
    ASSERT_GE(again.size(), 3u);
    EXPECT_EQ((Strings{"Mvd_ProcStop(2) = 0", "Mvd_Close(2) = 0", "Mvd_Open(\"127.0.0.1\", 5060, out=3) = 0"}),
              Strings(again.begin(), again.begin() + 3));
}

// A stream never created is never addressed: the media engine may have
// handed its id on.
TEST_F(LoopbackTest, RefusalsByTheMediaEngine) {
    // No stream: nothing is configured on it, and camera, image and release
    // leave stream 0 alone.
    failCalls("Mvd_Open", -1);
    startLoopback();
    EXPECT_EQ((Strings{"Mvd_Open(\"127.0.0.1\", 5060, out=0) = -1"}), newCalls());
    EXPECT_TRUE(logged("create stream failed", ANDROID_LOG_ERROR));
    EXPECT_TRUE(logged("init, loopback? 1 X"));
    EXPECT_TRUE(mediaEngineCallsOf([&] {
                    EXPECT_EQ(0, setCamera(1));
                    hide(kImage);
                    send(kRelease);
                }).empty());
    hostfakes::clearResult("Mvd_Open");

    // An unreadable codec keeps the payload type 121 and leaves the size to
    // the camera; failing steps are logged and the rest still runs.
    settleRemovals();  // of the camera's preview, whose count the log keeps
    log.clear();
    failCalls("Mvd_GetCdc", -1);
    failCalls("Mvd_SetSendPayload", 1);
    failCalls("Mvd_ProcStart", 1);
    EXPECT_EQ(loopbackStart(1, "", 1, 1), callsOf([&] { startLoopback(); }));
    EXPECT_TRUE(logged("SetSendPayload failed", ANDROID_LOG_ERROR));
    EXPECT_TRUE(logged("ProcStart failed", ANDROID_LOG_ERROR));
    EXPECT_FALSE(logged("getCameraSizeFromQos, no QOS seted"));
    EXPECT_FALSE(logged("create stream failed", ANDROID_LOG_ERROR));
}
