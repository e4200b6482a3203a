// The dispatcher: which commands create, keep and drop streams, and how the
// engine's setters fan out to the streams that run.
#include <android/log.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "CmdBuffer.h"
#include "CmdCallbackMvd.h"
#include "HostFakes.h"
#include "LogCapture.h"
#include "VtspRecord.h"

using namespace android;
using namespace vtspcodec;
using ::testing::Contains;
using ::testing::Not;
using V = std::vector<std::string>;

namespace {

const char* const kFront = "Camera 1, Facing front, Orientation 270";
const char* const kBack = "Camera 0, Facing back, Orientation 90";

StreamCommand streamCmd(int32_t code, uint32_t id, uint32_t dir = VTSP_STREAM_DIR_SENDRECV) {
    StreamCommand c;
    c.code = code;
    c.streamId = id;
    c.dir = dir;
    c.localAddr = address("10.0.0.1", static_cast<uint16_t>(6000 + 2 * id));
    c.remoteAddr = address("192.168.1.2", static_cast<uint16_t>(5000 + 2 * id));
    return c;
}

class CmdCallbackMvdTest : public ::testing::Test {
protected:
    CmdCallbackMvdTest() {
        hostfakes::reset();
        table->fill(CameraCodecParameter::CODEC_H264);
        table->fill(CameraCodecParameter::CODEC_OTHER);
        dispatcher = std::make_unique<CmdCallbackMvd>(table);
    }
    ~CmdCallbackMvdTest() override {
        dispatcher.reset();
        hostfakes::reset();
    }

    std::unique_ptr<CmdBuffer> send(const VPR_Comm& record) {
        CmdBuffer b(VPR_COMM_VTSP_CMD, record.body);
        b.translate(true);
        return std::unique_ptr<CmdBuffer>(dispatcher->parse(b));
    }
    std::unique_ptr<CmdBuffer> send(int32_t code, uint32_t id,
                                    uint32_t dir = VTSP_STREAM_DIR_SENDRECV) {
        return send(streamRecord(streamCmd(code, id, dir)));
    }
    std::unique_ptr<CmdBuffer> config(int16_t id, int16_t mask) {
        ConfigCommand c;
        c.data[1] = id;
        c.data[2] = mask;
        return send(configRecord(c));
    }

    // Engine calls made by `fn`.
    template <typename Fn>
    V callsOf(Fn fn) {
        const size_t mark = hostfakes::callCount();
        fn();
        return hostfakes::callTextsSince(mark);
    }

    size_t logged(const std::string& text) const {
        return log.count(ANDROID_LOG_DEBUG, "CmdclbMVD", text);
    }
    size_t mvdLines() const { return log.linesWithTag("CmdclbMVD").size(); }

    std::shared_ptr<CameraCodecParameter> table = std::make_shared<CameraCodecParameter>();
    LogCapture log;
    std::unique_ptr<CmdCallbackMvd> dispatcher;
};

}  // namespace

TEST_F(CmdCallbackMvdTest, StreamLivesFromItsStartUntilItsEnd) {
    std::unique_ptr<CmdBuffer> reply = send(_VTSP_CMD_STREAM_VIDEO_START, 5);
    EXPECT_EQ(1u, logged("parse: keep new stream, streamId 5"));
    EXPECT_EQ(0u, logged("exsited stream, streamId 5"));
    ASSERT_NE(nullptr, reply);
    ASSERT_EQ(VPR_COMM_NET, reply->type);
    const VprNetBind* bind = reinterpret_cast<const VprNetBind*>(reply->getCmd());
    EXPECT_EQ(7u, bind->code);
    EXPECT_EQ(5, bind->streamId);
    EXPECT_EQ(6010, bind->addr.port);
    EXPECT_EQ(1u, dispatcher->streamCount());
    ASSERT_NE(nullptr, dispatcher->stream(5));
    EXPECT_EQ(StreamInfoMvd::STREAM_SENDRECV, dispatcher->stream(5)->mStat);

    EXPECT_EQ(nullptr, send(_VTSP_CMD_STREAM_VIDEO_MODITY, 5, VTSP_STREAM_DIR_SENDONLY));
    EXPECT_EQ(1u, logged("exsited stream, streamId 5"));
    EXPECT_EQ(1u, logged("parse: keep new stream, streamId 5"));
    EXPECT_EQ(StreamInfoMvd::STREAM_SENDONLY, dispatcher->stream(5)->mStat);

    // The end drops the stream, and with it the engine stream is closed.
    V calls = callsOf([&] { EXPECT_EQ(nullptr, send(_VTSP_CMD_STREAM_VIDEO_END, 5)); });
    EXPECT_EQ((V{"Mvd_CaptureDetach(1) = 0", "Mvd_ProcStop(1) = 0", "Mvd_Close(1) = 0"}), calls);
    EXPECT_EQ(2u, logged("exsited stream, streamId 5"));
    EXPECT_EQ(1u, logged("delelte the stream, streamId 5"));
    EXPECT_TRUE(
            log.contains(ANDROID_LOG_INFO, "CmdclbMVD", "~StreamInfoMvd: Mvd_Close(1), stat 0"));
    EXPECT_EQ(0u, dispatcher->streamCount());
    EXPECT_EQ(nullptr, dispatcher->stream(5));
    EXPECT_EQ(std::vector<unsigned>{}, hostfakes::openMvdStreams());

    // A modify to direction "ended" drops a known stream as well.
    send(_VTSP_CMD_STREAM_VIDEO_START, 6);
    calls = callsOf([&] { send(_VTSP_CMD_STREAM_VIDEO_MODITY, 6, _VTSP_STREAM_DIR_ENDED); });
    EXPECT_EQ("Mvd_Close(2) = 0", calls.back());
    EXPECT_EQ(1u, logged("delelte the stream, streamId 6"));
    EXPECT_EQ(0u, dispatcher->streamCount());
}

TEST_F(CmdCallbackMvdTest, CommandsThatLeaveANewStreamEndedKeepNothing) {
    // An end for an unknown id creates a stream only to drop it again.
    EXPECT_EQ(V{}, callsOf([&] { EXPECT_EQ(nullptr, send(_VTSP_CMD_STREAM_VIDEO_END, 7)); }));
    EXPECT_EQ(1u, logged("parse: keep new stream, streamId 7"));
    EXPECT_EQ(0u, logged("delelte the stream, streamId 7"));
    EXPECT_EQ(0u, dispatcher->streamCount());

    // A start whose open fails still answers the modem but keeps nothing.
    hostfakes::setResult("Mvd_Open", -1);
    std::unique_ptr<CmdBuffer> reply = send(_VTSP_CMD_STREAM_VIDEO_START, 8);
    ASSERT_NE(nullptr, reply);
    EXPECT_EQ(8, reinterpret_cast<const VprNetBind*>(reply->getCmd())->streamId);
    EXPECT_TRUE(log.contains(ANDROID_LOG_ERROR, "CmdclbMVD",
                             "commandModifyHandler: Failed to Mvd_open, ip:10.0.0.1, port: 6016"));
    EXPECT_EQ(0u, dispatcher->streamCount());
    hostfakes::clearResult("Mvd_Open");

    // A start without a usable local end keeps nothing either.
    StreamCommand noLocal = streamCmd(_VTSP_CMD_STREAM_VIDEO_START, 9);
    noLocal.localAddr = noAddress();
    EXPECT_EQ(nullptr, send(streamRecord(noLocal)));
    EXPECT_EQ(0u, dispatcher->streamCount());
    EXPECT_EQ(V{"Mvd_Open(\"10.0.0.1\", 6016, out=0) = -1"}, hostfakes::callTexts());
}

TEST_F(CmdCallbackMvdTest, ModifyForAnUnknownIdKeepsAStreamThatNeverOpened) {
    StreamCommand c = streamCmd(_VTSP_CMD_STREAM_VIDEO_MODITY, 6, VTSP_STREAM_DIR_SENDONLY);
    c.remoteAddr = noAddress();
    EXPECT_EQ((V{"Mvd_TptSetSend(0, 1) = 0", "Mvd_TptSetRecv(0, 0) = 0"}),
              callsOf([&] { EXPECT_EQ(nullptr, send(streamRecord(c))); }));
    EXPECT_EQ(1u, logged("parse: keep new stream, streamId 6"));
    ASSERT_NE(nullptr, dispatcher->stream(6));
    EXPECT_EQ(0u, dispatcher->stream(6)->mMvdStreamId);
    EXPECT_EQ(StreamInfoMvd::STREAM_SENDONLY, dispatcher->stream(6)->mStat);

    // Ending it has nothing to detach or close.
    EXPECT_EQ(V{}, callsOf([&] { send(_VTSP_CMD_STREAM_VIDEO_END, 6); }));
    EXPECT_EQ(1u, logged("delelte the stream, streamId 6"));
    EXPECT_EQ(0u, dispatcher->streamCount());
}

TEST_F(CmdCallbackMvdTest, ConfigurationReachesOnlyExistingStreams) {
    EXPECT_EQ(V{}, callsOf([&] { EXPECT_EQ(nullptr, config(9, 0x30)); }));
    EXPECT_EQ(1u, logged("_VTSP_CMD_CONFIG, streamId 9"));
    EXPECT_EQ(1u, logged("stream is not created, streamId 9"));
    EXPECT_EQ(0u, logged("parse: keep new stream, streamId 9"));
    EXPECT_EQ(0u, dispatcher->streamCount());

    send(_VTSP_CMD_STREAM_VIDEO_START, 5);
    EXPECT_EQ((V{"Mvd_RedSetEnable(1, 0) = 0", "Mvd_SuspendAllStrm() = 0",
                 "Mvd_TptEnableTmmbr(1, 0) = 0", "Mvd_TptEnableNack(1, 1) = 0",
                 "Mvd_TptEnableFir(1, 0) = 0", "Mvd_ResumeAllStrm() = 0"}),
              callsOf([&] { EXPECT_EQ(nullptr, config(5, 0x30)); }));
    EXPECT_EQ(1u, logged("exsited stream, streamId 5"));
    EXPECT_EQ(1u, dispatcher->streamCount());
    EXPECT_EQ(StreamInfoMvd::STREAM_SENDRECV, dispatcher->stream(5)->mStat);

    // A negative id is the same bits as an unsigned key.
    EXPECT_EQ(V{}, callsOf([&] { config(-1, 0x30); }));
    EXPECT_EQ(1u, logged("_VTSP_CMD_CONFIG, streamId -1"));
    EXPECT_EQ(1u, logged("stream is not created, streamId -1"));
    send(_VTSP_CMD_STREAM_VIDEO_START, 0xFFFFFFFFu);
    ASSERT_NE(nullptr, dispatcher->stream(0xFFFFFFFFu));
    EXPECT_THAT(callsOf([&] { config(-1, 0x80); }), Contains("Mvd_TptEnableTmmbr(2, 1) = 0"));
    EXPECT_EQ(1u, logged("exsited stream, streamId -1"));
    EXPECT_EQ(0x80, dispatcher->stream(0xFFFFFFFFu)->mRTCPEnableMask);
    EXPECT_EQ(0x10, dispatcher->stream(5)->mRTCPEnableMask);
}

TEST_F(CmdCallbackMvdTest, OtherCodesAreLoggedAndIgnored) {
    send(_VTSP_CMD_STREAM_VIDEO_START, 5);
    log.clear();
    for (int32_t code : {20, 0, 83, -1}) {
        VPR_Comm record = commandRecord(code);
        reinterpret_cast<VtspCommand*>(record.body)->u.stmVideo.streamId = 5;
        EXPECT_EQ(V{}, callsOf([&] { EXPECT_EQ(nullptr, send(record)); })) << code;
        EXPECT_EQ(1u, logged("code " + std::to_string(code) + ", not supported yet, ignore it"));
    }
    EXPECT_EQ(4u, mvdLines());
    EXPECT_EQ(1u, dispatcher->streamCount());
}

TEST_F(CmdCallbackMvdTest, CodecConfigurationIsHandedToStreamsCreatedLater) {
    EXPECT_EQ(CameraCodecParameter::CAMERA_VGA_REVERSED_30FPS, dispatcher->cameraConfig());
    dispatcher->setCodecParam(CameraCodecParameter::CAMERA_QVGA_REVERSED_15FPS);
    EXPECT_EQ(0u, hostfakes::callCount());
    EXPECT_EQ(0u, mvdLines());
    EXPECT_EQ(CameraCodecParameter::CAMERA_QVGA_REVERSED_15FPS, dispatcher->cameraConfig());

    const V calls = callsOf([&] { send(_VTSP_CMD_STREAM_VIDEO_START, 5); });
    EXPECT_THAT(calls, Contains("Mvd_ArsSetParm(1, 90000, 372000, 10, 15) = 0"));
    EXPECT_THAT(calls, Contains("Mvd_SetCdc(1, {pt=96 br=256000 fps=15 240x320}) = 0"));

    // Running streams take a new configuration in ascending id order.
    send(_VTSP_CMD_STREAM_VIDEO_START, 3);
    EXPECT_EQ((V{"Mvd_GetCdc(2, \"H264\", {pt=96 br=256000 fps=15 240x320}) = 0",
                 "Mvd_SuspendAllStrm() = 0", "Mvd_SetCdc(2, {pt=96 br=384000 fps=30 240x320}) = 0",
                 "Mvd_ResumeAllStrm() = 0",
                 "Mvd_GetCdc(1, \"H264\", {pt=96 br=256000 fps=15 240x320}) = 0",
                 "Mvd_SuspendAllStrm() = 0", "Mvd_SetCdc(1, {pt=96 br=384000 fps=30 240x320}) = 0",
                 "Mvd_ResumeAllStrm() = 0"}),
              callsOf([&] {
                  dispatcher->setCodecParam(CameraCodecParameter::CAMERA_QVGA_REVERSED_30FPS);
              }));
}

TEST_F(CmdCallbackMvdTest, CaptureNameGoesToRunningStreamsInIdOrderAndToLaterOnes) {
    EXPECT_STREQ(kFront, dispatcher->captureId());
    dispatcher->setCaptureId(nullptr);
    EXPECT_THAT(callsOf([&] { send(_VTSP_CMD_STREAM_VIDEO_START, 8); }),
                Contains(std::string("Mvd_CaptureAttach(1, \"") + kFront + "\") = 0"));
    send(_VTSP_CMD_STREAM_VIDEO_START, 3);
    log.clear();

    // Stream 3 (engine stream 2) comes before stream 8 (engine stream 1).
    EXPECT_EQ((V{std::string("Mvd_CaptureAttach(2, \"") + kBack + "\") = 0",
                 std::string("Mvd_CaptureAttach(1, \"") + kBack + "\") = 0"}),
              callsOf([&] { dispatcher->setCaptureId(kBack); }));
    EXPECT_EQ(2u, logged(std::string("setCaptureId: setCaptureId(), [") + kFront + "] -> [" +
                         kBack + "]"));

    // Null keeps the last name, for running and for new streams.
    EXPECT_EQ(V{}, callsOf([&] { dispatcher->setCaptureId(nullptr); }));
    EXPECT_STREQ(kBack, dispatcher->captureId());
    EXPECT_THAT(callsOf([&] { send(_VTSP_CMD_STREAM_VIDEO_START, 5); }),
                Contains(std::string("Mvd_CaptureAttach(3, \"") + kBack + "\") = 0"));
}

TEST_F(CmdCallbackMvdTest, RenderNameAndReplacedImageFanOutInIdOrder) {
    // With no streams nothing happens and nothing is logged.
    dispatcher->setRenderId("RemoteView");
    dispatcher->sendReplacedImage(true, "/x.jpg");
    EXPECT_EQ(0u, hostfakes::callCount());
    EXPECT_EQ(0u, mvdLines());

    send(_VTSP_CMD_STREAM_VIDEO_START, 8);
    send(_VTSP_CMD_STREAM_VIDEO_START, 3, VTSP_STREAM_DIR_SENDONLY);
    send(_VTSP_CMD_STREAM_VIDEO_START, 5, VTSP_STREAM_DIR_RECVONLY);
    // New streams start with the default render name: the dispatcher keeps none.
    EXPECT_THAT(hostfakes::callTexts(), Contains("Mvd_SetUniqueName(1, \"Remote\") = 0"));
    EXPECT_THAT(hostfakes::callTexts(), Not(Contains(::testing::HasSubstr("RemoteView"))));

    // The send-only stream 3 (engine stream 2) only stores the name.
    EXPECT_EQ((V{"Mvd_SetUniqueName(3, \"RemoteView\") = 0",
                 "Mvd_SetUniqueName(1, \"RemoteView\") = 0"}),
              callsOf([&] { dispatcher->setRenderId("RemoteView"); }));
    EXPECT_STREQ("RemoteView", dispatcher->stream(3)->mRenderId);
    EXPECT_EQ(V{}, callsOf([&] { dispatcher->setRenderId(nullptr); }));

    log.clear();
    EXPECT_EQ((V{"Mvd_FileStartSendImage(2, \"/x.jpg\") = 0",
                 "Mvd_FileStartSendImage(3, \"/x.jpg\") = 0",
                 "Mvd_FileStartSendImage(1, \"/x.jpg\") = 0"}),
              callsOf([&] { dispatcher->sendReplacedImage(true, "/x.jpg"); }));
    EXPECT_EQ((V{"Mvd_FileStopSendImage(2) = 0", "Mvd_FileStopSendImage(3) = 0",
                 "Mvd_FileStopSendImage(1) = 0"}),
              callsOf([&] { dispatcher->sendReplacedImage(false, "/x.jpg"); }));
    for (const char* what : {"start", "stop"}) {
        EXPECT_EQ(3u, log.count(ANDROID_LOG_INFO, "CmdclbMVD",
                                std::string("sendReplacedImage, ") + what + ", path = /x.jpg"));
    }
}

TEST_F(CmdCallbackMvdTest, DestructionClosesEveryKeptStream) {
    send(_VTSP_CMD_STREAM_VIDEO_START, 4);
    send(_VTSP_CMD_STREAM_VIDEO_START, 2);
    // A stream held by someone else outlives the dispatcher.
    std::shared_ptr<StreamInfoMvd> held = dispatcher->stream(4);
    V calls = callsOf([&] { dispatcher.reset(); });
    EXPECT_EQ((V{"Mvd_Close(2) = 0"}), calls);
    EXPECT_EQ((std::vector<unsigned>{1}), hostfakes::openMvdStreams());
    calls = callsOf([&] { held.reset(); });
    EXPECT_EQ((V{"Mvd_Close(1) = 0"}), calls);
}

TEST_F(CmdCallbackMvdTest, SettersAndCommandsFromTwoThreadsStayConsistent) {
    constexpr uint32_t kIds[] = {1, 2, 3, 4};
    constexpr int kRounds = 60;
    std::atomic<bool> done{false};
    std::thread engine([&] {
        const CameraCodecParameter::CameraConfigEnum configs[] = {
                CameraCodecParameter::CAMERA_VGA_REVERSED_30FPS,
                CameraCodecParameter::CAMERA_QVGA_REVERSED_15FPS};
        // At least a few rounds even if the commands finish first.
        for (int i = 0; i < 20 || !done.load(); ++i) {
            dispatcher->setCaptureId(i % 2 != 0 ? kBack : kFront);
            dispatcher->setRenderId(i % 2 != 0 ? "RemoteView" : "Remote");
            dispatcher->setCodecParam(configs[i % 2]);
            dispatcher->sendReplacedImage(i % 3 == 0, "/x.jpg");
            if (i % 5 == 0) dispatcher->setCaptureId(nullptr);
        }
    });
    for (int round = 0; round < kRounds; ++round) {
        for (uint32_t id : kIds) send(_VTSP_CMD_STREAM_VIDEO_START, id);
        for (uint32_t id : kIds) send(_VTSP_CMD_STREAM_VIDEO_MODITY, id, 1 + (id + round) % 4);
        for (uint32_t id : kIds) config(static_cast<int16_t>(id), round % 2 != 0 ? 0x10 : 0xD0);
        if (round + 1 < kRounds) {
            for (uint32_t id : kIds) send(_VTSP_CMD_STREAM_VIDEO_END, id);
            EXPECT_EQ(0u, dispatcher->streamCount());
        }
    }
    done = true;
    engine.join();

    // The last round's streams are kept, each with its own open engine
    // stream; every earlier engine stream was closed.
    EXPECT_EQ(4u, dispatcher->streamCount());
    std::vector<unsigned> kept;
    for (uint32_t id : kIds) {
        std::shared_ptr<StreamInfoMvd> s = dispatcher->stream(id);
        ASSERT_NE(nullptr, s);
        EXPECT_EQ(id, s->mStreamId);
        EXPECT_TRUE(s->isAlive());
        kept.push_back(s->mMvdStreamId);
    }
    std::sort(kept.begin(), kept.end());
    EXPECT_EQ(kept, hostfakes::openMvdStreams());
    const V names = hostfakes::callNames();
    EXPECT_EQ(std::count(names.begin(), names.end(), "Mvd_Open"),
              std::count(names.begin(), names.end(), "Mvd_Close") + 4);
    dispatcher.reset();
    EXPECT_EQ(std::vector<unsigned>{}, hostfakes::openMvdStreams());
}
