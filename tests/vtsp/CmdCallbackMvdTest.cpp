// The dispatcher: which commands create, keep and drop streams, and how the
// engine's setters fan out to the streams that run. What one stream does with
// a command is StreamInfoMvdTest's business.
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
using ::testing::HasSubstr;
using ::testing::Not;
using V = std::vector<std::string>;

namespace {

const std::string kFront = kFrontCameraName;
const std::string kBack = kBackCameraName;

StreamCommand streamCmd(int32_t code, uint32_t id, uint32_t dir = VTSP_STREAM_DIR_SENDRECV) {
    StreamCommand c;
    c.code = code;
    c.streamId = id;
    c.dir = dir;
    c.localAddr = address("10.0.0.1", static_cast<uint16_t>(6000 + 2 * id));
    c.remoteAddr = address("192.168.1.2", static_cast<uint16_t>(5000 + 2 * id));
    return c;
}

// The stream a reply asks the modem to bind, -1 for no bind request.
int32_t boundStream(const std::unique_ptr<CmdBuffer>& reply) {
    if (reply == nullptr || reply->type != VPR_COMM_NET) return -1;
    return reinterpret_cast<const VprNetBind*>(reply->getCmd())->streamId;
}

V only(const std::string& prefix, const V& calls) {
    V out;
    std::copy_if(calls.begin(), calls.end(), std::back_inserter(out),
                 [&](const std::string& c) { return c.rfind(prefix, 0) == 0; });
    return out;
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

    // Each command starts a fresh log, so decisions() names its lines only.
    std::unique_ptr<CmdBuffer> send(const VPR_Comm& record) {
        log.clear();
        CmdBuffer b(VPR_COMM_VTSP_CMD, record.body);
        b.translate(true);
        return std::unique_ptr<CmdBuffer>(dispatcher->parse(b));
    }
    std::unique_ptr<CmdBuffer> send(int32_t code, uint32_t id, uint32_t dir = VTSP_STREAM_DIR_SENDRECV) {
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

    // The dispatcher's own debug lines (the streams log under the same tag).
    V decisions() const {
        V out;
        for (const LogLine& l : log.linesWithTag("CmdclbMVD")) {
            for (const char* p : {"parse: keep", "exsited", "delelte", "stream is not", "_VTSP_CMD_CONFIG,", "code "}) {
                if (l.priority == ANDROID_LOG_DEBUG && l.text.rfind(p, 0) == 0) out.push_back(l.text);
            }
        }
        return out;
    }
    size_t mvdLines() const { return log.linesWithTag("CmdclbMVD").size(); }

    std::shared_ptr<CameraCodecParameter> table = std::make_shared<CameraCodecParameter>();
    LogCapture log;
    std::unique_ptr<CmdCallbackMvd> dispatcher;
};

}  // namespace

TEST_F(CmdCallbackMvdTest, StreamLivesFromItsStartUntilItsEnd) {
    // The stream's reply goes back; what the dump shows of it is DumpTest's part.
    EXPECT_EQ(5, boundStream(send(_VTSP_CMD_STREAM_VIDEO_START, 5)));
    EXPECT_EQ((V{"parse: keep new stream, streamId 5"}), decisions());
    EXPECT_EQ(1u, dispatcher->streamCount());

    EXPECT_EQ(nullptr, send(_VTSP_CMD_STREAM_VIDEO_MODITY, 5, VTSP_STREAM_DIR_SENDONLY));
    EXPECT_EQ((V{"exsited stream, streamId 5"}), decisions());
    EXPECT_EQ(StreamInfoMvd::STREAM_SENDONLY, dispatcher->snapshot(5)->stat);

    // The end drops the stream, and with it the engine stream is closed.
    EXPECT_EQ((V{"Mvd_CaptureDetach(1) = 0", "Mvd_ProcStop(1) = 0", "Mvd_Close(1) = 0"}),
              callsOf([&] { EXPECT_EQ(nullptr, send(_VTSP_CMD_STREAM_VIDEO_END, 5)); }));
    EXPECT_EQ((V{"exsited stream, streamId 5", "delelte the stream, streamId 5"}), decisions());
    EXPECT_FALSE(dispatcher->snapshot(5));

    // A modify to direction "ended" drops a known stream as well.
    send(_VTSP_CMD_STREAM_VIDEO_START, 6);
    EXPECT_EQ("Mvd_Close(2) = 0",
              callsOf([&] { send(_VTSP_CMD_STREAM_VIDEO_MODITY, 6, _VTSP_STREAM_DIR_ENDED); }).back());
    EXPECT_EQ((V{"exsited stream, streamId 6", "delelte the stream, streamId 6"}), decisions());
    EXPECT_EQ(0u, dispatcher->streamCount());
    EXPECT_EQ(std::vector<unsigned>{}, hostfakes::openMvdStreams());
}

// A stream command for an unknown id creates a stream; it is kept unless
// the command leaves it ended.
TEST_F(CmdCallbackMvdTest, CommandsForUnknownIdsKeepOnlyStreamsLeftAlive) {
    // An end creates a stream only to drop it again.
    EXPECT_EQ(V{}, callsOf([&] { EXPECT_EQ(nullptr, send(_VTSP_CMD_STREAM_VIDEO_END, 7)); }));
    EXPECT_EQ((V{"parse: keep new stream, streamId 7"}), decisions());
    EXPECT_EQ(0u, dispatcher->streamCount());

    // A start whose open fails still answers the modem but keeps nothing;
    // so does a start without a usable local end (no engine call at all).
    hostfakes::setResult("Mvd_Open", -1);
    EXPECT_EQ(8, boundStream(send(_VTSP_CMD_STREAM_VIDEO_START, 8)));
    hostfakes::clearResult("Mvd_Open");
    StreamCommand noLocal = streamCmd(_VTSP_CMD_STREAM_VIDEO_START, 9);
    noLocal.localAddr = noAddress();
    EXPECT_EQ(nullptr, send(streamRecord(noLocal)));
    EXPECT_EQ(0u, dispatcher->streamCount());
    EXPECT_EQ(V{"Mvd_Open(\"10.0.0.1\", 6016, out=0) = -1"}, hostfakes::callTexts());

    // A modify is kept even though its stream never opened an engine stream.
    StreamCommand c = streamCmd(_VTSP_CMD_STREAM_VIDEO_MODITY, 6, VTSP_STREAM_DIR_SENDONLY);
    c.remoteAddr = noAddress();
    EXPECT_EQ((V{"Mvd_TptSetSend(0, 1) = 0", "Mvd_TptSetRecv(0, 0) = 0"}),
              callsOf([&] { EXPECT_EQ(nullptr, send(streamRecord(c))); }));
    EXPECT_EQ((V{"parse: keep new stream, streamId 6"}), decisions());
    ASSERT_TRUE(dispatcher->snapshot(6));
    EXPECT_EQ(StreamInfoMvd::STREAM_SENDONLY, dispatcher->snapshot(6)->stat);
    // Ending it has nothing to detach or close.
    EXPECT_EQ(V{}, callsOf([&] { send(_VTSP_CMD_STREAM_VIDEO_END, 6); }));
    EXPECT_EQ((V{"exsited stream, streamId 6", "delelte the stream, streamId 6"}), decisions());
    EXPECT_EQ(0u, dispatcher->streamCount());
}

TEST_F(CmdCallbackMvdTest, ConfigurationReachesOnlyExistingStreams) {
    EXPECT_EQ(V{}, callsOf([&] { EXPECT_EQ(nullptr, config(9, 0x30)); }));
    EXPECT_EQ((V{"_VTSP_CMD_CONFIG, streamId 9", "stream is not created, streamId 9"}), decisions());
    send(_VTSP_CMD_STREAM_VIDEO_START, 5);
    EXPECT_EQ(nullptr, config(5, 0x30));
    EXPECT_EQ((V{"_VTSP_CMD_CONFIG, streamId 5", "exsited stream, streamId 5"}), decisions());

    // A negative id is the same bits as an unsigned key.
    EXPECT_EQ(V{}, callsOf([&] { config(-1, 0x30); }));
    EXPECT_EQ((V{"_VTSP_CMD_CONFIG, streamId -1", "stream is not created, streamId -1"}), decisions());
    send(_VTSP_CMD_STREAM_VIDEO_START, 0xFFFFFFFFu);
    config(-1, 0x80);
    EXPECT_EQ((V{"_VTSP_CMD_CONFIG, streamId -1", "exsited stream, streamId -1"}), decisions());

    EXPECT_EQ(2u, dispatcher->streamCount());  // configuration creates no stream
    EXPECT_EQ(0x10, dispatcher->snapshot(5)->rtcpMask);  // 0x30 keeps just NACK
    EXPECT_EQ(0x80, dispatcher->snapshot(0xFFFFFFFFu)->rtcpMask);
}

TEST_F(CmdCallbackMvdTest, OtherCodesAreLoggedAndIgnored) {
    send(_VTSP_CMD_STREAM_VIDEO_START, 5);
    for (int32_t code : {20, 0, 83, -1}) {
        VPR_Comm record = commandRecord(code);
        reinterpret_cast<VtspCommand*>(record.body)->u.stmVideo.streamId = 5;
        EXPECT_EQ(V{}, callsOf([&] { EXPECT_EQ(nullptr, send(record)); })) << code;
        EXPECT_EQ(V{"code " + std::to_string(code) + ", not supported yet, ignore it"}, decisions());
        EXPECT_EQ(1u, mvdLines());
    }
    EXPECT_EQ(1u, dispatcher->streamCount());
}

TEST_F(CmdCallbackMvdTest, CodecConfigurationIsHandedToStreamsCreatedLater) {
    EXPECT_EQ(CameraCodecParameter::CAMERA_VGA_REVERSED_30FPS, dispatcher->cameraConfig());
    EXPECT_EQ(V{}, callsOf([&] { dispatcher->setCodecParam(CameraCodecParameter::CAMERA_QVGA_REVERSED_15FPS); }));
    EXPECT_EQ(0u, mvdLines());
    EXPECT_EQ(CameraCodecParameter::CAMERA_QVGA_REVERSED_15FPS, dispatcher->cameraConfig());
    EXPECT_THAT(callsOf([&] { send(_VTSP_CMD_STREAM_VIDEO_START, 5); }),
                Contains("Mvd_SetCdc(1, {pt=96 br=256000 fps=15 240x320}) = 0"));

    // Running streams take a new configuration in ascending id order: stream
    // 3 (engine stream 2) before stream 5 (engine stream 1).
    send(_VTSP_CMD_STREAM_VIDEO_START, 3);
    EXPECT_EQ((V{"Mvd_SetCdc(2, {pt=96 br=384000 fps=30 240x320}) = 0",
                 "Mvd_SetCdc(1, {pt=96 br=384000 fps=30 240x320}) = 0"}),
              only("Mvd_SetCdc", callsOf([&] {
                       dispatcher->setCodecParam(CameraCodecParameter::CAMERA_QVGA_REVERSED_30FPS);
                   })));
}

TEST_F(CmdCallbackMvdTest, CaptureNameGoesToRunningStreamsInIdOrderAndToLaterOnes) {
    EXPECT_EQ(kFront, dispatcher->captureId());
    dispatcher->setCaptureId(nullptr);
    EXPECT_THAT(callsOf([&] { send(_VTSP_CMD_STREAM_VIDEO_START, 8); }),
                Contains("Mvd_CaptureAttach(1, \"" + kFront + "\") = 0"));
    send(_VTSP_CMD_STREAM_VIDEO_START, 3);
    // Stream 3 (engine stream 2) comes before stream 8 (engine stream 1).
    EXPECT_EQ((V{"Mvd_CaptureAttach(2, \"" + kBack + "\") = 0", "Mvd_CaptureAttach(1, \"" + kBack + "\") = 0"}),
              callsOf([&] { dispatcher->setCaptureId(kBackCameraName); }));

    // Null keeps the last name, for running and for new streams.
    EXPECT_EQ(V{}, callsOf([&] { dispatcher->setCaptureId(nullptr); }));
    EXPECT_EQ(kBack, dispatcher->captureId());
    EXPECT_THAT(callsOf([&] { send(_VTSP_CMD_STREAM_VIDEO_START, 5); }),
                Contains("Mvd_CaptureAttach(3, \"" + kBack + "\") = 0"));
}

TEST_F(CmdCallbackMvdTest, RenderNameAndReplacedImageFanOutInIdOrder) {
    // With no streams nothing happens and nothing is logged.
    EXPECT_EQ(V{}, callsOf([&] {
                  dispatcher->setRenderId("RemoteView");
                  dispatcher->sendReplacedImage(true, "/x.jpg");
              }));
    EXPECT_EQ(0u, mvdLines());

    send(_VTSP_CMD_STREAM_VIDEO_START, 8);
    send(_VTSP_CMD_STREAM_VIDEO_START, 3, VTSP_STREAM_DIR_SENDONLY);
    send(_VTSP_CMD_STREAM_VIDEO_START, 5, VTSP_STREAM_DIR_RECVONLY);
    // New streams start with the default render name: the dispatcher keeps none.
    EXPECT_THAT(hostfakes::callTexts(), Contains("Mvd_SetUniqueName(1, \"Remote\") = 0"));
    EXPECT_THAT(hostfakes::callTexts(), Not(Contains(HasSubstr("RemoteView"))));

    // By stream id: 3 (engine stream 2, send-only, only stores the name), 5 (3), 8 (1).
    EXPECT_EQ((V{"Mvd_SetUniqueName(3, \"RemoteView\") = 0", "Mvd_SetUniqueName(1, \"RemoteView\") = 0"}),
              callsOf([&] { dispatcher->setRenderId("RemoteView"); }));
    EXPECT_EQ(V{}, callsOf([&] { dispatcher->setRenderId(nullptr); }));

    EXPECT_EQ((V{"Mvd_FileStartSendImage(2, \"/x.jpg\") = 0", "Mvd_FileStartSendImage(3, \"/x.jpg\") = 0",
                 "Mvd_FileStartSendImage(1, \"/x.jpg\") = 0", "Mvd_FileStopSendImage(2) = 0",
                 "Mvd_FileStopSendImage(3) = 0", "Mvd_FileStopSendImage(1) = 0"}),
              callsOf([&] {
                  dispatcher->sendReplacedImage(true, "/x.jpg");
                  dispatcher->sendReplacedImage(false, "/x.jpg");
              }));
}

TEST_F(CmdCallbackMvdTest, SettersAndCommandsFromTwoThreadsStayConsistent) {
    constexpr uint32_t kIds[] = {1, 2, 3, 4};
    constexpr int kRounds = 60;
    std::atomic<bool> done{false};
    std::thread engine([&] {
        const CameraCodecParameter::CameraConfigEnum configs[] = {CameraCodecParameter::CAMERA_VGA_REVERSED_30FPS,
                                                                  CameraCodecParameter::CAMERA_QVGA_REVERSED_15FPS};
        // At least a few rounds even if the commands finish first.
        for (int i = 0; i < 20 || !done.load(); ++i) {
            dispatcher->setCaptureId(i % 2 != 0 ? kBackCameraName : kFrontCameraName);
            dispatcher->setRenderId(i % 2 != 0 ? "RemoteView" : "Remote");
            dispatcher->setCodecParam(configs[i % 2]);
            dispatcher->sendReplacedImage(i % 3 == 0, "/x.jpg");
            if (i % 5 == 0) dispatcher->setCaptureId(nullptr);
            // Diagnostics read the streams while commands change them.
            for (const StreamSnapshot& s : dispatcher->snapshots()) EXPECT_NE(StreamInfoMvd::STREAM_ENDED, s.stat);
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
    // stream; every earlier engine stream was closed, and destruction
    // closes the kept ones.
    EXPECT_EQ(4u, dispatcher->streamCount());
    EXPECT_EQ(4u, hostfakes::openMvdStreams().size());
    EXPECT_EQ(hostfakes::callCount("Mvd_Open"), hostfakes::callCount("Mvd_Close") + 4);
    dispatcher.reset();
    EXPECT_EQ(std::vector<unsigned>{}, hostfakes::openMvdStreams());
}
