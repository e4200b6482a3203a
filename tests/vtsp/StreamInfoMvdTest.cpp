// One video stream driven by modem commands and engine setters, observed
// through the media engine calls it makes and the lines it logs.
#include <android/log.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

#include "CmdBuffer.h"
#include "HostFakes.h"
#include "LogCapture.h"
#include "StreamInfoMvd.h"
#include "VtspRecord.h"

using namespace android;
using namespace vtspcodec;
using ::testing::Contains;
using ::testing::Not;
using ::testing::StartsWith;
using V = std::vector<std::string>;

namespace {

constexpr uint32_t kVtspId = 5;
const std::string kOpen = "Mvd_Open(\"10.0.0.1\", 6000, out=1) = 0";
const std::string kStartCodec = "{pt=96 br=600000 fps=30 480x640}";
const std::string kAttachFront = "Mvd_CaptureAttach(1, \"Camera 1, Facing front, Orientation 270\") = 0";
// What a modify that changes nothing asks of engine stream 1 after a start.
const V kQuiet = {"Mvd_SetUniqueName(1, \"Remote\") = 0", "Mvd_GetCdc(1, \"H264\", " + kStartCodec + ") = 0",
                  "Mvd_RedSetEnable(1, 0) = 0"};
// The bind request answering a start of stream 5 on 10.0.0.1:6000.
const std::string kBind = "bind 7, stream 5, 10.0.0.1:6000, type 0";

// What a start with both ends and direction 4 asks of a fresh engine stream `id`.
V startCalls(unsigned id) {
    const std::string i = std::to_string(id);
    return {"Mvd_Open(\"10.0.0.1\", 6000, out=" + i + ") = 0", "Mvd_TptSetSend(" + i + ", 1) = 0",
            "Mvd_TptSetRecv(" + i + ", 1) = 0", "Mvd_SetRmtAddr(" + i + ", \"192.168.1.2\", 5000) = 0",
            "Mvd_SetUniqueName(" + i + ", \"Remote\") = 0", "Mvd_GetCdc(" + i + ", \"H264\", {pt=0 br=0 fps=0 0x0}) = 0",
            "Mvd_ArsSetEnable(" + i + ", 1) = 0", "Mvd_ArsSetParm(" + i + ", 100000, 960000, 20, 30) = 0",
            "Mvd_SetCdc(" + i + ", {pt=96 br=600000 fps=30 480x640}) = 0", "Mvd_SetSendPayload(" + i + ", 96) = 0",
            "Mvd_RedSetEnable(" + i + ", 0) = 0", "Mvd_ProcStart(" + i + ") = 0",
            "Mvd_CaptureAttach(" + i + ", \"Camera 1, Facing front, Orientation 270\") = 0"};
}

V then(V first, const V& rest) {
    first.insert(first.end(), rest.begin(), rest.end());
    return first;
}

StreamCommand command(int32_t code, uint32_t dir, uint16_t remotePort = 5000, const char* remoteIp = "192.168.1.2") {
    StreamCommand c;
    c.code = code;
    c.streamId = kVtspId;
    c.dir = dir;
    c.localAddr = address("10.0.0.1", 6000);
    c.remoteAddr = remotePort != 0 ? address(remoteIp, remotePort) : noAddress();
    return c;
}
StreamCommand start(uint32_t dir) { return command(_VTSP_CMD_STREAM_VIDEO_START, dir); }
StreamCommand modify(uint32_t dir) { return command(_VTSP_CMD_STREAM_VIDEO_MODITY, dir); }
StreamCommand end(uint32_t dir) { return command(_VTSP_CMD_STREAM_VIDEO_END, dir); }

VPR_Comm rtcpMask(int16_t on, int16_t mask) {
    ConfigCommand c;
    c.data[0] = on;
    c.data[1] = static_cast<int16_t>(kVtspId);
    c.data[2] = mask;
    return configRecord(c);
}

// A reply's bind request in host order, "" for anything else; its bytes
// after the address must be zero.
std::string bindText(const std::unique_ptr<CmdBuffer>& reply) {
    if (reply == nullptr || reply->type != VPR_COMM_NET || reply->length != kVprNetBindSize) return "";
    VprNetBind b;
    memcpy(&b, reply->getCmd(), sizeof(b));
    for (uint8_t byte : b.reserved) if (byte != 0) return "reserved bytes set";
    return "bind " + std::to_string(b.code) + ", stream " + std::to_string(b.streamId) + ", " +
           endpointText(b.addr) + ", type " + std::to_string(b.addr.type);
}

class StreamInfoMvdTest : public ::testing::Test {
protected:
    StreamInfoMvdTest() {
        hostfakes::reset();
        table->fill(CameraCodecParameter::CODEC_H264);
        table->fill(CameraCodecParameter::CODEC_OTHER);
        stream = makeStream();
    }
    ~StreamInfoMvdTest() override {
        stream.reset();
        hostfakes::reset();
    }

    std::unique_ptr<StreamInfoMvd> makeStream(
            CameraCodecParameter::CameraConfigEnum config = CameraCodecParameter::CAMERA_VGA_REVERSED_30FPS) {
        return std::make_unique<StreamInfoMvd>(table, config, kFrontCameraName);
    }

    // The engine calls `fn` makes; lines() then holds only its lines.
    template <typename Fn>
    V callsOf(Fn fn) {
        log.clear();
        const size_t mark = hostfakes::callCount();
        fn();
        return hostfakes::callTextsSince(mark);
    }
    // Runs one command in host order; the reply is kept for the test.
    V run(const VPR_Comm& record, StreamInfoMvd* s = nullptr) {
        CmdBuffer b(VPR_COMM_VTSP_CMD, record.body);
        b.translate(true);
        return callsOf([&] { reply.reset((s != nullptr ? s : stream.get())->parse(b)); });
    }
    V run(const StreamCommand& c, StreamInfoMvd* s = nullptr) { return run(streamRecord(c), s); }

    // A new stream on a fresh engine, as if the test began again.
    void fresh() {
        stream = makeStream();
        hostfakes::reset();
    }

    // Starts the stream sending and receiving with its codec applied.
    void startRunning() {
        run(start(VTSP_STREAM_DIR_SENDRECV));
        ASSERT_EQ(StreamInfoMvd::STREAM_SENDRECV, stream->mStat);
        ASSERT_EQ(1, stream->mProcStartCnt);
        log.clear();
    }

    // The stream's log lines, each prefixed with its priority letter as logcat shows it.
    V lines() const {
        V out;
        for (const LogLine& l : log.linesWithTag("CmdclbMVD")) out.push_back("??VDIWEF"[l.priority & 7] + (" " + l.text));
        return out;
    }

    std::shared_ptr<CameraCodecParameter> table = std::make_shared<CameraCodecParameter>();
    LogCapture log;
    std::unique_ptr<StreamInfoMvd> stream;
    std::unique_ptr<CmdBuffer> reply;
};

}  // namespace

TEST_F(StreamInfoMvdTest, StartRunsEveryStepInOrderAndAsksTheModemToBind) {
    EXPECT_EQ(startCalls(1), run(start(VTSP_STREAM_DIR_SENDRECV)));
    // A stream command read through the configuration view names no RTCP
    // template, so the initial mask stays and no feedback switch is touched.
    EXPECT_EQ((V{"D _VTSP_CMD_STREAM_VIDEO_START", "D local 10.0.0.1\\6000[1]",
                 "D <<<<<<<<<<<<<<<<VTSP_STREAM_DIR_SENDRECV>>>>>>>>>>>>>>>>>", "D remote 192.168.1.2\\5000[1]",
                 "D socketRemoteParamConfig: Mvd_SetRmtAddr, ip:192.168.1.2, port: 5000, streamId 1, ret 0",
                 "D commandModifyHandler: Mvd_SetUniqueName(), streamId 1, renderid Remote, ret 0",
                 "D codecParamConfig: codec set payload 96, bitrate 600000, fps 30, 480 x 640, mCameraConfig 2",
                 "D rtcpParamConfig Recive RTCP mask, templCode: 5, data[0]: 4, data[2]: 0, mRTCPEnableMask: 208",
                 "D rtcpParamConfigMvd_RtpSetExt, extension: 0, uri: , id: 0",
                 "D rtcpParamConfig: Mvd_RedSetEnable(), ret 0", "D rtcpParamConfig: return",
                 "D commandModifyHandler: Mvd_ProcStart(1), ret 0, cnt 1",
                 "D commandModifyHandler: Mvd_CaptureAttach(), streamId 1, ret 0"}),
              lines());
    EXPECT_EQ(kBind, bindText(reply));  // the local end, in host order until the link sends it

    // A second start gives the running engine stream back before opening
    // another, which is then set up in full.
    EXPECT_EQ(then({"Mvd_CaptureDetach(1) = 0", "Mvd_ProcStop(1) = 0", "Mvd_Close(1) = 0"}, startCalls(2)),
              run(start(VTSP_STREAM_DIR_SENDRECV)));
    EXPECT_EQ(kBind, bindText(reply));
    EXPECT_EQ(std::vector<unsigned>{2}, hostfakes::openMvdStreams());
}

TEST_F(StreamInfoMvdTest, DirectionChangesSwitchTransportAndProcessing) {
    startRunning();
    struct Step {
        uint32_t dir;
        V before, after;  // the calls around the quiet part
        int32_t stat, procStarts;
        std::string banner;
    };
    const V both = {"Mvd_TptSetSend(1, 1) = 0", "Mvd_TptSetRecv(1, 1) = 0"};
    const Step steps[] = {
        // Held: processing stops, nothing restarts it.
        {_VTSP_STREAM_DIR_INACTIVE, {"Mvd_ProcStop(1) = 0"}, {}, StreamInfoMvd::STREAM_INACTIVE, 0,
         "<<<<<<<<<<<<<<<_VTSP_STREAM_DIR_INACTIVE>>>>>>>>>>>>>>>"},
        // Back to both directions: transport on, processing and camera restart.
        {VTSP_STREAM_DIR_SENDRECV, both, {"Mvd_ProcStart(1) = 0", kAttachFront}, StreamInfoMvd::STREAM_SENDRECV, 1,
         "<<<<<<<<<<<<<<<<VTSP_STREAM_DIR_SENDRECV>>>>>>>>>>>>>>>>>"},
        // The same direction again switches nothing and does not start twice.
        {VTSP_STREAM_DIR_SENDRECV, {}, {}, StreamInfoMvd::STREAM_SENDRECV, 1, ""},
        {VTSP_STREAM_DIR_SENDONLY, {"Mvd_TptSetSend(1, 1) = 0", "Mvd_TptSetRecv(1, 0) = 0"}, {},
         StreamInfoMvd::STREAM_SENDONLY, 1, "<<<<<<<<<<<<<<<VTSP_STREAM_DIR_SENDONLY>>>>>>>>>>>>>>>>>"},
        {VTSP_STREAM_DIR_RECVONLY, {"Mvd_TptSetSend(1, 0) = 0", "Mvd_TptSetRecv(1, 1) = 0"}, {},
         StreamInfoMvd::STREAM_RECVONLY, 1, "<<<<<<<<<<<<<<<VTSP_STREAM_DIR_RECVONLY>>>>>>>>>>>>>>>>>>"},
        // An unknown direction leaves the state; direction "ended" stops processing.
        {7, {}, {}, StreamInfoMvd::STREAM_RECVONLY, 1, ""},
        {_VTSP_STREAM_DIR_ENDED, {"Mvd_ProcStop(1) = 0"}, {}, StreamInfoMvd::STREAM_ENDED, 0,
         "<<<<<<<<<<<<<<_VTSP_STREAM_DIR_ENDED>>>>>>>>>>>>>>>>>"},
    };
    for (const Step& s : steps) {
        SCOPED_TRACE(s.dir);
        EXPECT_EQ(then(then(s.before, kQuiet), s.after), run(modify(s.dir)));
        EXPECT_EQ(nullptr, reply);
        EXPECT_EQ(s.stat, stream->mStat);
        EXPECT_EQ(s.stat != StreamInfoMvd::STREAM_ENDED, stream->isAlive());
        EXPECT_EQ(s.procStarts, stream->mProcStartCnt);
        // The local end, once known, is neither re-read nor logged again.
        EXPECT_THAT(lines(), Not(Contains(StartsWith("D local"))));
        if (!s.banner.empty()) {
            EXPECT_THAT(lines(), Contains("D " + s.banner));
        }
    }
}

TEST_F(StreamInfoMvdTest, WithoutALocalPortNothingHappensAndAFailedOpenStillReplies) {
    StreamCommand portZero = modify(VTSP_STREAM_DIR_SENDRECV);
    portZero.localAddr = address("10.0.0.1", 0);
    EXPECT_EQ(V{}, run(portZero));
    EXPECT_EQ(nullptr, reply);
    EXPECT_EQ((V{"D _VTSP_CMD_STREAM_VIDEO_MODITY", "D local 10.0.0.1\\0[1]"}), lines());
    EXPECT_EQ(StreamInfoMvd::STREAM_ENDED, stream->mStat);

    // The bind request still goes out so the modem learns the local end.
    hostfakes::setResult("Mvd_Open", -1);
    EXPECT_EQ((V{"Mvd_Open(\"10.0.0.1\", 6000, out=0) = -1"}), run(start(VTSP_STREAM_DIR_SENDRECV)));
    EXPECT_EQ(kBind, bindText(reply));
    EXPECT_EQ((V{"D _VTSP_CMD_STREAM_VIDEO_START", "D local 10.0.0.1\\6000[1]",
                 "E commandModifyHandler: Failed to Mvd_open, ip:10.0.0.1, port: 6000"}),
              lines());
    EXPECT_EQ(StreamInfoMvd::STREAM_ENDED, stream->mStat);
    EXPECT_EQ(0u, stream->mMvdStreamId);
}

TEST_F(StreamInfoMvdTest, RemoteEndIsTakenOnceAndOnlyANewPortReachesTheEngine) {
    EXPECT_EQ((V{kOpen, "Mvd_TptSetSend(1, 1) = 0", "Mvd_TptSetRecv(1, 1) = 0"}),
              run(command(_VTSP_CMD_STREAM_VIDEO_START, VTSP_STREAM_DIR_SENDRECV, 0)));
    EXPECT_EQ(kBind, bindText(reply));
    EXPECT_THAT(lines(), Contains("D remote \\0[0]"));

    // Processing starts only once the remote is known. The stream was
    // already active, so the first codec set suspends the
    // engine's streams and the same command resumes them.
    EXPECT_EQ((V{"Mvd_SetRmtAddr(1, \"192.168.1.2\", 5000) = 0", "Mvd_SetUniqueName(1, \"Remote\") = 0",
                 "Mvd_GetCdc(1, \"H264\", {pt=0 br=0 fps=0 0x0}) = 0", "Mvd_SuspendAllStrm() = 0",
                 "Mvd_ArsSetEnable(1, 1) = 0", "Mvd_ArsSetParm(1, 100000, 960000, 20, 30) = 0",
                 "Mvd_SetCdc(1, " + kStartCodec + ") = 0", "Mvd_SetSendPayload(1, 96) = 0",
                 "Mvd_RedSetEnable(1, 0) = 0", "Mvd_ResumeAllStrm() = 0", "Mvd_ProcStart(1) = 0", kAttachFront}),
              run(modify(VTSP_STREAM_DIR_SENDRECV)));
    EXPECT_EQ(nullptr, reply);
    EXPECT_THAT(lines(), Contains("D codecParamConfig Mvd_SuspendAllStrm, codec params changed "));

    // Only a new port reaches the engine.
    EXPECT_EQ(kQuiet, run(command(_VTSP_CMD_STREAM_VIDEO_MODITY, VTSP_STREAM_DIR_SENDRECV, 5000, "192.168.1.99")));
    // The address stays the first one learnt; the port change is resumed
    // by the same command.
    EXPECT_EQ(then(then({"Mvd_SetRmtAddr(1, \"192.168.1.2\", 5002) = 0"}, kQuiet), {"Mvd_ResumeAllStrm() = 0"}),
              run(command(_VTSP_CMD_STREAM_VIDEO_MODITY, VTSP_STREAM_DIR_SENDRECV, 5002, "192.168.1.99")));
    EXPECT_THAT(lines(), Contains("D socketRemoteParamConfig: Port changed, Mvd_SetRmtAddr,port: 5002, ret 0"));

    // IPv6 ends, in either type value, are passed as eight full groups.
    auto v6 = makeStream();
    StreamCommand c = start(VTSP_STREAM_DIR_SENDRECV);
    c.localAddr = address("fe80::1", 6000);
    c.localAddr.type = kAddrTypeIpv6Alt;
    c.remoteAddr = address("2001:db8::2", 5000);
    const V calls = run(c, v6.get());
    EXPECT_EQ("Mvd_Open(\"fe80:0:0:0:0:0:0:1\", 6000, out=2) = 0", calls.at(0));
    EXPECT_EQ("Mvd_SetRmtAddr(2, \"2001:db8:0:0:0:0:0:2\", 5000) = 0", calls.at(3));
    EXPECT_THAT(lines(), Contains("D local fe80:0:0:0:0:0:0:1\\6000[2]"));
    EXPECT_THAT(lines(), Contains("D remote 2001:db8:0:0:0:0:0:2\\5000[2]"));
}

TEST_F(StreamInfoMvdTest, RateControlFollowsTheBandwidthCapAndTheFrameRate) {
    struct Case {
        uint32_t kbps;
        int upper;
    };
    // 4194304 kbit/s overflows to 0 and so means no cap, like 0 itself.
    const Case cases[] = {{500, 512000}, {0, 960000},       {2000, 960000},  {937, 959488},
                          {938, 960000}, {4194304, 960000}, {4194305, 1024}};
    unsigned id = 0;
    for (const Case& k : cases) {
        auto s = makeStream();
        StreamCommand c = start(VTSP_STREAM_DIR_SENDRECV);
        c.localVideoAsBwKbps = k.kbps;
        EXPECT_THAT(run(c, s.get()), Contains("Mvd_ArsSetParm(" + std::to_string(++id) + ", 100000, " +
                                              std::to_string(k.upper) + ", 20, 30) = 0"))
                << k.kbps;
    }

    auto slow = makeStream(CameraCodecParameter::CAMERA_VGA_REVERSED_15FPS);
    StreamCommand c = start(VTSP_STREAM_DIR_SENDRECV);
    c.encodeType[0] = 100;
    const V calls = run(c, slow.get());
    EXPECT_THAT(calls, Contains("Mvd_ArsSetParm(8, 100000, 660000, 10, 15) = 0"));
    EXPECT_THAT(calls, Contains("Mvd_SetCdc(8, {pt=100 br=400000 fps=15 480x640}) = 0"));
    EXPECT_THAT(calls, Contains("Mvd_SetSendPayload(8, 100) = 0"));
    EXPECT_THAT(lines(), Contains("D codecParamConfig: codec set payload 100, bitrate 400000, "
                                  "fps 15, 480 x 640, mCameraConfig 1"));
}

TEST_F(StreamInfoMvdTest, CodecStepFailuresDecideWhetherProcessingStarts) {
    const V reachedTheCodec = {kOpen, "Mvd_TptSetSend(1, 1) = 0", "Mvd_TptSetRecv(1, 1) = 0",
                               "Mvd_SetRmtAddr(1, \"192.168.1.2\", 5000) = 0",
                               "Mvd_SetUniqueName(1, \"Remote\") = 0"};
    // An encoder other than 0 is refused before the codec is read.
    StreamCommand other = start(VTSP_STREAM_DIR_SENDRECV);
    other.encoder = 1;
    EXPECT_EQ(reachedTheCodec, run(other));
    EXPECT_EQ(kBind, bindText(reply));
    EXPECT_THAT(lines(), Contains("D codec type 1 is not supported "));

    // A codec that cannot be read is left alone and the stream still runs.
    fresh();
    hostfakes::setResult("Mvd_GetCdc", -1);
    EXPECT_EQ(then(reachedTheCodec, {"Mvd_GetCdc(1, \"H264\", out=-) = -1", "Mvd_RedSetEnable(1, 0) = 0",
                                     "Mvd_ProcStart(1) = 0", kAttachFront}),
              run(start(VTSP_STREAM_DIR_SENDRECV)));
    EXPECT_THAT(lines(), Contains("E checkIfCodecParamUpdated: GetCodec failed !!!"));

    // A codec the engine refuses stops the command before processing.
    fresh();
    hostfakes::setResult("Mvd_SetCdc", -1);
    const V calls = run(start(VTSP_STREAM_DIR_SENDRECV));
    ASSERT_FALSE(calls.empty());
    EXPECT_EQ("Mvd_SetCdc(1, " + kStartCodec + ") = -1", calls.back());
    EXPECT_THAT(calls, Contains("Mvd_ArsSetParm(1, 100000, 960000, 20, 30) = 0"));
    EXPECT_EQ(kBind, bindText(reply));
    EXPECT_EQ("E codecParamConfig: SetCodec failed !!!", lines().back());

    // Refused on a running stream, after every engine stream was suspended
    // for it: they go on with the codec they had.
    fresh();
    startRunning();
    hostfakes::setResult("Mvd_SetCdc", -1);
    StreamCommand newPayload = modify(VTSP_STREAM_DIR_SENDRECV);
    newPayload.encodeType[0] = 100;
    const V refused = run(newPayload);
    EXPECT_THAT(refused, Contains("Mvd_SuspendAllStrm() = 0"));
    EXPECT_EQ("Mvd_ResumeAllStrm() = 0", refused.back());
    EXPECT_EQ(std::vector<unsigned>{}, hostfakes::suspendedMvdStreams());
    EXPECT_FALSE(stream->mParamChanged);
}

TEST_F(StreamInfoMvdTest, OnlyTheVideoOrientationUriSetsTheExtension) {
    StreamCommand c = start(VTSP_STREAM_DIR_SENDRECV);
    c.extension = 1;
    c.extmapId = 3;
    c.extmapUri = "urn:3gpp:video-orientation";
    const V calls = run(c);
    EXPECT_EQ((V{"Mvd_RtpSetExt(1, 2, 3) = 0", "Mvd_RedSetEnable(1, 0) = 0", "Mvd_ProcStart(1) = 0", kAttachFront}),
              V(calls.end() - std::min<size_t>(4, calls.size()), calls.end()));
    EXPECT_THAT(lines(), Contains("D rtcpParamConfigMvd_RtpSetExt, extension: 1, "
                                  "uri: urn:3gpp:video-orientation, id: 3"));

    c.code = _VTSP_CMD_STREAM_VIDEO_MODITY;
    c.extmapId = 0x103;  // only the low byte is the id
    EXPECT_THAT(run(c), Contains("Mvd_RtpSetExt(1, 2, 3) = 0"));
    for (const char* uri : {"urn:3gpp:video-orientation:7", "urn:3gpp:video-orientatio", ""}) {
        c.extmapUri = uri;
        EXPECT_THAT(run(c), Not(Contains(StartsWith("Mvd_RtpSetExt")))) << uri;
    }

    // A URI filling its whole field is read as exactly those 128 characters;
    // the bytes behind it ("abcd" in confMask) are not part of it.
    c.extmapUri = "urn:3gpp:video-orientation" + std::string(102, 'x');
    c.confMask = 0x64636261;
    EXPECT_THAT(run(c), Not(Contains(StartsWith("Mvd_RtpSetExt"))));
    EXPECT_THAT(lines(), Contains("D rtcpParamConfigMvd_RtpSetExt, extension: 1, uri: " + c.extmapUri + ", id: 259"));
}

TEST_F(StreamInfoMvdTest, RtcpMaskChangeOnAnActiveStreamIsWrappedInASuspend) {
    startRunning();
    EXPECT_EQ((V{"Mvd_RedSetEnable(1, 0) = 0", "Mvd_SuspendAllStrm() = 0", "Mvd_TptEnableTmmbr(1, 0) = 0",
                 "Mvd_TptEnableNack(1, 1) = 0", "Mvd_TptEnableFir(1, 0) = 0", "Mvd_ResumeAllStrm() = 0"}),
              run(rtcpMask(1, 0x30)));
    EXPECT_EQ(nullptr, reply);
    EXPECT_EQ((V{"D _VTSP_CMD_CONFIG", "D Recive RTCP mask 48",
                 "D rtcpParamConfig Recive RTCP mask, templCode: 23, data[0]: 1, data[2]: 48, mRTCPEnableMask: 16",
                 "D rtcpParamConfigMvd_RtpSetExt, extension: 0, uri: , id: 0",
                 "D rtcpParamConfig: Mvd_RedSetEnable(), ret 0",
                 "D rtcpParamConfig Mvd_SuspendAllStrm, rtcp params changed ",
                 "D rtcpParamConfig: Mvd_TptEnableTmmbr(), ret 0", "D rtcpParamConfig: Mvd_TptEnableNack(), ret 0",
                 "D rtcpParamConfig: Mvd_TptEnableFir(), ret 0"}),
              lines());

    // The same mask again changes nothing; a disabled template is ignored.
    for (int16_t on : {1, 2, -1}) {
        EXPECT_EQ((V{"Mvd_RedSetEnable(1, 0) = 0"}), run(rtcpMask(on, on == 1 ? 0x30 : 0x80))) << on;
        EXPECT_THAT(lines(), Contains("D rtcpParamConfig: return")) << on;
    }
    EXPECT_THAT(lines(), Contains("D rtcpParamConfig Recive RTCP mask, templCode: 23, "
                                  "data[0]: -1, data[2]: 128, mRTCPEnableMask: 16"));

    // The suspend was lifted by the configuration itself: the next modify
    // has nothing to resume.
    EXPECT_EQ(kQuiet, run(modify(VTSP_STREAM_DIR_SENDRECV)));

    // A held stream switches feedback without suspending anything; a
    // negative mask is sign-extended before the kept bits are taken.
    run(modify(_VTSP_STREAM_DIR_INACTIVE));
    EXPECT_EQ((V{"Mvd_RedSetEnable(1, 0) = 0", "Mvd_TptEnableTmmbr(1, 1) = 0", "Mvd_TptEnableNack(1, 1) = 0",
                 "Mvd_TptEnableFir(1, 1) = 0"}),
              run(rtcpMask(1, -1)));
}

TEST_F(StreamInfoMvdTest, SetCodecParamReplacesTheCodecAroundASuspendWhenActive) {
    startRunning();
    // Words the stream does not own come back to the engine unchanged.
    tagMVD_CODEC seeded{};
    ASSERT_TRUE(hostfakes::getMvdCodec(1, &seeded));
    for (int i : {1, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15, 16, 17, 18, 19}) seeded.aiWord[i] = 7000 + i;
    hostfakes::setMvdCodec(1, seeded);
    const std::string qvga15 = "{pt=96 br=256000 fps=15 240x320}";
    const auto setTo = [&](CameraCodecParameter::CameraConfigEnum config) {
        return callsOf([&] { stream->setCodecParam(config); });
    };
    EXPECT_EQ((V{"Mvd_GetCdc(1, \"H264\", " + kStartCodec + ") = 0", "Mvd_SuspendAllStrm() = 0",
                 "Mvd_SetCdc(1, " + qvga15 + ") = 0", "Mvd_ResumeAllStrm() = 0"}),
              setTo(CameraCodecParameter::CAMERA_QVGA_REVERSED_15FPS));
    EXPECT_EQ((V{"D setCodecParam Mvd_SuspendAllStrm, codec params changed "}), lines());
    tagMVD_CODEC stored{};
    ASSERT_TRUE(hostfakes::getMvdCodec(1, &stored));
    const int expected[20] = {96,   7001, 256000, 15,   240,  320,  7006, 7007, 7008, 7009,
                              7010, 7011, 7012,   7013, 7014, 7015, 7016, 7017, 7018, 7019};
    for (int i = 0; i < 20; ++i) EXPECT_EQ(expected[i], stored.aiWord[i]) << i;

    // The same configuration again only reads the codec.
    EXPECT_EQ((V{"Mvd_GetCdc(1, \"H264\", " + qvga15 + ") = 0"}),
              setTo(CameraCodecParameter::CAMERA_QVGA_REVERSED_15FPS));

    // A refused codec does not leave the engine suspended: the streams go on
    // with the codec they had, and the next modify applies the new one.
    hostfakes::setResult("Mvd_SetCdc", -1);
    EXPECT_EQ((V{"Mvd_GetCdc(1, \"H264\", " + qvga15 + ") = 0", "Mvd_SuspendAllStrm() = 0",
                 "Mvd_SetCdc(1, " + kStartCodec + ") = -1", "Mvd_ResumeAllStrm() = 0"}),
              setTo(CameraCodecParameter::CAMERA_VGA_REVERSED_30FPS));
    EXPECT_THAT(lines(), Contains("E setCodecParam: SetCodec failed !!!"));
    EXPECT_FALSE(stream->mParamChanged);
    hostfakes::clearResult("Mvd_SetCdc");
    const V calls = run(modify(VTSP_STREAM_DIR_SENDRECV));
    ASSERT_FALSE(calls.empty());
    EXPECT_THAT(calls, Contains("Mvd_SetCdc(1, " + kStartCodec + ") = 0"));
    EXPECT_EQ("Mvd_ResumeAllStrm() = 0", calls.back());

    // A modify that stops at a refused encoder still lifts the suspend of
    // its remote port change; the held stream then takes the codec without
    // suspending or resuming the engine.
    StreamCommand hold = command(_VTSP_CMD_STREAM_VIDEO_MODITY, _VTSP_STREAM_DIR_INACTIVE, 5004);
    hold.encoder = 1;
    EXPECT_EQ("Mvd_ResumeAllStrm() = 0", run(hold).back());
    EXPECT_FALSE(stream->mParamChanged);
    ASSERT_EQ(StreamInfoMvd::STREAM_INACTIVE, stream->mStat);
    EXPECT_EQ((V{"Mvd_GetCdc(1, \"H264\", " + kStartCodec + ") = 0",
                 "Mvd_SetCdc(1, {pt=96 br=400000 fps=30 352x288}) = 0"}),
              setTo(CameraCodecParameter::CAMERA_CIF_30FPS));
    EXPECT_FALSE(stream->mParamChanged);
}

TEST_F(StreamInfoMvdTest, CaptureAndRenderNamesReachTheEngineOnlyWhenTheyMatter) {
    const std::string frontCopy = kFrontCameraName, remoteCopy = kRemoteRenderName;  // same text, other pointer
    const std::string view = "RemoteView";
    // Not open yet: only a new name is taken and logged, nothing is attached.
    EXPECT_EQ(V{}, callsOf([&] {
                  stream->setCaptureId(nullptr);
                  stream->setCaptureId(frontCopy.c_str());
                  stream->setRenderId(nullptr);
                  stream->setRenderId(remoteCopy.c_str());
                  stream->setCaptureId(kBackCameraName);
              }));
    EXPECT_EQ((V{"D setCaptureId: setCaptureId(), [Camera 1, Facing front, Orientation 270] -> "
                 "[Camera 0, Facing back, Orientation 90]"}),
              lines());

    // Send-only: the render name waits for the next modify.
    EXPECT_THAT(run(start(VTSP_STREAM_DIR_SENDONLY)),
                Contains("Mvd_CaptureAttach(1, \"Camera 0, Facing back, Orientation 90\") = 0"));
    EXPECT_EQ(V{}, callsOf([&] { stream->setRenderId(view.c_str()); }));
    EXPECT_EQ(V{}, lines());
    EXPECT_THAT(run(modify(VTSP_STREAM_DIR_SENDONLY)), Contains("Mvd_SetUniqueName(1, \"RemoteView\") = 0"));

    // Receiving: the render name and the camera go to the engine at once.
    run(modify(VTSP_STREAM_DIR_RECVONLY));
    EXPECT_EQ((V{"Mvd_SetUniqueName(1, \"Remote\") = 0", kAttachFront}), callsOf([&] {
                  stream->setRenderId("Remote");
                  stream->setCaptureId(kFrontCameraName);
              }));

    // Held: names are stored but nothing is attached or renamed.
    run(modify(_VTSP_STREAM_DIR_INACTIVE));
    EXPECT_EQ(V{}, callsOf([&] {
                  stream->setCaptureId(kBackCameraName);
                  stream->setRenderId(view.c_str());
              }));
    EXPECT_STREQ(kBackCameraName, stream->mCaptureId);
    EXPECT_STREQ("RemoteView", stream->mRenderId);
}

TEST_F(StreamInfoMvdTest, ReplacedImageNeedsAnEngineStream) {
    EXPECT_EQ(V{}, callsOf([&] { stream->sendReplacedImage(true, "/x.jpg"); }));
    EXPECT_EQ((V{"I sendReplacedImage, start, path = /x.jpg", "D sendReplacedImage no valid stream"}), lines());

    startRunning();
    EXPECT_EQ((V{"Mvd_FileStartSendImage(1, \"/x.jpg\") = 0", "Mvd_FileStopSendImage(1) = 0"}), callsOf([&] {
                  stream->sendReplacedImage(true, "/x.jpg");
                  stream->sendReplacedImage(false, "/x.jpg");
              }));
    EXPECT_EQ((V{"I sendReplacedImage, start, path = /x.jpg", "I sendReplacedImage, stop, path = /x.jpg"}),
              lines());
}

// Ending a running stream, one never opened, and closing at destruction:
// CmdCallbackMvdTest, through the dispatcher that drops ended streams.
TEST_F(StreamInfoMvdTest, EndingAHeldStreamOnlyDetachesTheCamera) {
    run(start(_VTSP_STREAM_DIR_INACTIVE));
    EXPECT_EQ((V{"Mvd_CaptureDetach(1) = 0"}), run(end(_VTSP_STREAM_DIR_INACTIVE)));
    EXPECT_EQ((V{"Mvd_Close(1) = 0"}), callsOf([&] { stream.reset(); }));
    EXPECT_EQ((V{"I ~StreamInfoMvd: Mvd_Close(1), stat 0"}), lines());
}
