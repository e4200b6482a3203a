// The record body in memory: byte order, composing outgoing records, the
// dump, address text and the construction counters.
#include <android/log.h>
#include <gtest/gtest.h>

#include <cstring>
#include <thread>
#include <vector>

#include "CmdBuffer.h"
#include "LogCapture.h"
#include "StreamInfoMvd.h"
#include "VtspRecord.h"

using namespace android;
using namespace vtspcodec;

namespace {

CmdBuffer bufferOf(const VPR_Comm& record) { return CmdBuffer(VPR_COMM_VTSP_CMD, record.body); }

StreamCommand sampleStart() {
    StreamCommand c;
    c.code = _VTSP_CMD_STREAM_VIDEO_START;
    c.streamId = 5;
    c.dir = VTSP_STREAM_DIR_SENDRECV;
    c.remoteAddr = address("192.168.1.2", 5000);
    c.remoteControlPort = 5001;
    c.localAddr = address("fe80::1", 6000);
    c.localControlPort = 6001;
    return c;
}

}  // namespace

TEST(CmdBuffer, TranslateSwapsOnlyPortsAndIpv6GroupsOfACommand) {
    CmdBuffer cmd = bufferOf(streamRecord(sampleStart()));
    const VtspStmVideoView& v = cmd.command().u.stmVideo;
    // On the wire the port 5000 is the bytes 0x13 0x88.
    const unsigned char* port = cmd.getCmd() + 216 + 20;
    EXPECT_EQ(0x13, port[0]);
    EXPECT_EQ(0x88, port[1]);

    cmd.translate(true);
    EXPECT_EQ(5000, v.remoteAddr.port);
    EXPECT_EQ(5001, v.remoteControlPort);
    EXPECT_EQ(6000, v.localAddr.port);
    EXPECT_EQ(6001, v.localControlPort);
    EXPECT_EQ(0xfe80, v.localAddr.ipv6[0]);
    EXPECT_EQ(1, v.localAddr.ipv6[7]);
    const uint8_t octets[4] = {192, 168, 1, 2};
    EXPECT_EQ(0, memcmp(octets, v.remoteAddr.ipv4, 4));

    char text[kIpTextSize];
    ConvertIpToString(text, v.remoteAddr.ipv4, true);
    EXPECT_STREQ("192.168.1.2", text);
    ConvertIpToString(text, v.localAddr.ipv6, false);
    EXPECT_STREQ("fe80:0:0:0:0:0:0:1", text);

    // The other direction does nothing to a command, nor host order to a bind request.
    CmdBuffer copy(cmd);
    copy.translate(false);
    EXPECT_EQ(0, memcmp(copy.getCmd(), cmd.getCmd(), kVtspCommandSize));
    std::unique_ptr<CmdBuffer> bind(BindToNet(&v.localAddr, 5));
    std::vector<unsigned char> before(bind->getCmd(), bind->getCmd() + bind->length);
    bind->translate(true);
    EXPECT_EQ(0, memcmp(before.data(), bind->getCmd(), bind->length));
    bind->translate(false);
    EXPECT_EQ(0x17, bind->getCmd()[8 + 20]);  // 6000 big-endian
    EXPECT_EQ(0x70, bind->getCmd()[8 + 21]);
}

TEST(CmdBuffer, AddressTextCoversZerosAndLongestForms) {
    char text[kIpTextSize];
    const uint8_t zero4[4] = {};
    ConvertIpToString(text, zero4, true);
    EXPECT_STREQ("0.0.0.0", text);
    const uint16_t zero6[8] = {};
    ConvertIpToString(text, zero6, false);
    EXPECT_STREQ("0:0:0:0:0:0:0:0", text);
    const uint16_t full6[8] = {0xffff, 0xffff, 0xffff, 0xffff, 0xffff, 0xffff, 0xffff, 0xffff};
    ConvertIpToString(text, full6, false);
    EXPECT_STREQ("ffff:ffff:ffff:ffff:ffff:ffff:ffff:ffff", text);
    const uint8_t max4[4] = {255, 255, 255, 255};
    ConvertIpToString(text, max4, true);
    EXPECT_STREQ("255.255.255.255", text);
}

TEST(CmdBuffer, ComposeFillsTheTrailerByBodyKind) {
    OSAL_NetAddress addr = address("10.0.0.1", 6000);
    std::unique_ptr<CmdBuffer> bind(BindToNet(&addr, 9));
    ASSERT_EQ(kVprNetBindSize, bind->length);
    VPR_Comm out{};
    bind->compose(&out);
    EXPECT_EQ(1u, out.targetModule);
    EXPECT_EQ(0u, out.type);
    EXPECT_EQ(3664u, out.recordLength);
    EXPECT_EQ(0, memcmp(out.body, bind->getCmd(), kVprNetBindSize));
    for (size_t i = kVprNetBindSize; i < kVprCommBodySize; ++i) ASSERT_EQ(0, out.body[i]) << i;

    CmdBuffer cmd = bufferOf(streamRecord(sampleStart()));
    VPR_Comm out2{};
    cmd.compose(&out2);
    EXPECT_EQ(0u, out2.targetModule);
    EXPECT_EQ(3664u, out2.recordLength);
    EXPECT_EQ(0, memcmp(out2.body, cmd.getCmd(), kVtspCommandSize));

    // An unknown body kind carries nothing.
    unsigned char bytes[kCmdBufferCapacity];
    memset(bytes, 0xAB, sizeof(bytes));
    CmdBuffer unknown(static_cast<VPR_CommType>(3), bytes);
    EXPECT_EQ(0u, unknown.length);
    VPR_Comm out3{};
    unknown.compose(&out3);
    for (unsigned char b : out3.body) ASSERT_EQ(0, b);
    EXPECT_EQ(kVprType1Size, CmdBuffer(VPR_COMM_TYPE1, bytes).length);
}

TEST(CmdBuffer, PrintDumpsStreamCommandsOnly) {
    LogCapture log;
    StreamCommand c = sampleStart();
    c.localAddr = address("10.0.0.1", 6000);
    c.encodeType[0] = 96;
    c.encodeType[1] = 97;
    c.localVideoAsBwKbps = 500;
    c.remoteVideoAsBwKbps = 600;
    c.extension = 1;
    c.extmapId = 3;
    c.extmapUri = "urn:3gpp:video-orientation";
    CmdBuffer cmd = bufferOf(streamRecord(c));
    cmd.translate(true);
    cmd.print();
    const std::string expected =
            "VTSP Command: type 0, length 444  code: 81, infc: 0 \n"
            " arg0~6: 5 4 0 0 0 0 0\n"
            " stmVideo: streamId 5 dir 4 encoder 0 confMask 0x0 rdnDynType 0\n"
            "           remoteAddr<ipv4 0x201a8c0 ipv6 0x0000 0000 0000 0000 0000 0000 0000 0000, port 5000, type: 0>\n"
            "           remoteControlPort 5001\n"
            "           localAddr<ipv4 0x100000a ipv6 0x0000 0000 0000 0000 0000 0000 0000 0000, port 6000, type: 0>\n"
            "           localControlPort 6001\n"
            "           localVideoAsBwKbps 500 Kbps\n"
            "           remoteVideoAsBwKbps 600 Kbps\n"
            "           encodeType[0] 96, encodeType[1] 97\n"
            "           rtp extension: extension 1, extmapId 3, extmapUri urn:3gpp:video-orientation\n";
    EXPECT_EQ(1u, log.count(ANDROID_LOG_INFO, "cmdbuffer", expected));

    // Configuration commands and other codes below 79 are never dumped.
    log.clear();
    ConfigCommand config;
    CmdBuffer(VPR_COMM_VTSP_CMD, configRecord(config).body).print();
    CmdBuffer(VPR_COMM_VTSP_CMD, commandRecord(78).body).print();
    CmdBuffer(VPR_COMM_VTSP_CMD, commandRecord(-5).body).print();
    EXPECT_TRUE(log.linesWithTag("cmdbuffer").size() == 3u);  // only the three destructor lines
    for (const LogLine& line : log.lines()) EXPECT_EQ(ANDROID_LOG_DEBUG, line.priority);
}

TEST(CmdBuffer, UnterminatedExtensionUriIsCutAtItsField) {
    LogCapture log;
    StreamCommand c = sampleStart();
    c.extmapUri = std::string(200, 'u');  // fills all 128 bytes, no terminator
    VPR_Comm record = streamRecord(c);
    VtspCommand* body = reinterpret_cast<VtspCommand*>(record.body);
    body->u.stmVideo.confMask = 0x64636261;  // "abcd" right behind the URI
    CmdBuffer cmd(VPR_COMM_VTSP_CMD, record.body);
    cmd.print();
    const std::vector<LogLine> lines = log.linesWithTag("cmdbuffer");
    ASSERT_FALSE(lines.empty());
    const std::string& dump = lines[0].text;
    EXPECT_NE(std::string::npos, dump.find("extmapUri " + std::string(128, 'u') + "\n"));
    EXPECT_EQ(std::string::npos, dump.find("abcd"));
}

TEST(CmdBuffer, CopiesCarryTheBodyAndCountersStayConsistentAcrossThreads) {
    LogCapture log;
    CmdBuffer source = bufferOf(streamRecord(sampleStart()));
    CmdBuffer copy(source);
    EXPECT_EQ(source.type, copy.type);
    EXPECT_EQ(source.length, copy.length);
    EXPECT_EQ(0, memcmp(source.getCmd(), copy.getCmd(), source.length));
    CmdBuffer assigned;
    EXPECT_EQ(0u, assigned.length);
    const int32_t before = CmdBuffer::con.load();
    assigned = source;
    EXPECT_EQ(before + 1, CmdBuffer::con.load());  // assignment counts as a construction
    EXPECT_EQ(0, memcmp(source.getCmd(), assigned.getCmd(), source.length));

    const int32_t con0 = CmdBuffer::con.load();
    const int32_t des0 = CmdBuffer::des.load();
    constexpr int kThreads = 4;
    constexpr int kEach = 500;
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t) {
        threads.emplace_back([] {
            for (int i = 0; i < kEach; ++i) CmdBuffer b;
        });
    }
    for (auto& t : threads) t.join();
    EXPECT_EQ(con0 + kThreads * kEach, CmdBuffer::con.load());
    EXPECT_EQ(des0 + kThreads * kEach, CmdBuffer::des.load());
    // The destructor's line names the new destruction count and the constructions.
    const std::string last = "~CmdBuffer: " + std::to_string(CmdBuffer::des.load()) + "/";
    bool found = false;
    for (const LogLine& line : log.linesWithTag("cmdbuffer")) {
        if (line.text.rfind(last, 0) == 0) found = true;
    }
    EXPECT_TRUE(found);
}
