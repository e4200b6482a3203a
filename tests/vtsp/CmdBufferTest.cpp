// The record body in memory: byte order, composing outgoing records, the
// dump, address text and the destructor's counters.
#include <android/log.h>
#include <gtest/gtest.h>

#include <cstring>
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
    c.remoteAddr = address("192.168.1.2", 5000);
    c.remoteControlPort = 5001;
    c.localAddr = address("fe80::1", 6000);
    c.localControlPort = 6001;
    return c;
}

std::string ipText(const void* addr, bool ipv4) {
    char text[kIpTextSize];
    ConvertIpToString(text, addr, ipv4);
    return text;
}

bool same(const CmdBuffer& a, const CmdBuffer& b) {
    return a.type == b.type && a.length == b.length && memcmp(a.getCmd(), b.getCmd(), a.length) == 0;
}

}  // namespace

TEST(CmdBuffer, TranslateSwapsOnlyPortsAndIpv6GroupsOfACommand) {
    const VPR_Comm wire = streamRecord(sampleStart());
    CmdBuffer cmd = bufferOf(wire);
    const VtspStmVideoView& v = cmd.command().u.stmVideo;
    cmd.translate(true);
    EXPECT_EQ((std::vector<int>{5000, 5001, 6000, 6001, 0xfe80, 1}),
              (std::vector<int>{v.remoteAddr.port, v.remoteControlPort, v.localAddr.port, v.localControlPort,
                                v.localAddr.ipv6[0], v.localAddr.ipv6[7]}));
    EXPECT_EQ("192.168.1.2", ipText(v.remoteAddr.ipv4, true));  // octets are not swapped

    // The other direction does nothing to a command, nor host order to a bind request.
    CmdBuffer copy(cmd);
    copy.translate(false);
    EXPECT_EQ(0, memcmp(copy.getCmd(), cmd.getCmd(), kVtspCommandSize));
    std::unique_ptr<CmdBuffer> bind(BindToNet(&v.localAddr, 5));
    const CmdBuffer before(*bind);
    bind->translate(true);
    EXPECT_TRUE(same(before, *bind));
    bind->translate(false);
    // The bind request leaves with exactly the local address bytes the modem sent.
    EXPECT_EQ(0, memcmp(bind->getCmd() + 8, wire.body + 248, sizeof(OSAL_NetAddress)));
}

TEST(CmdBuffer, AddressTextCoversZerosAndLongestForms) {
    const uint8_t zero4[4] = {}, max4[4] = {255, 255, 255, 255};
    const uint16_t zero6[8] = {}, one6[8] = {0xfe80, 0, 0, 0, 0, 0, 0, 1};
    const uint16_t full6[8] = {0xffff, 0xffff, 0xffff, 0xffff, 0xffff, 0xffff, 0xffff, 0xffff};
    EXPECT_EQ("0.0.0.0", ipText(zero4, true));
    EXPECT_EQ("255.255.255.255", ipText(max4, true));
    EXPECT_EQ("0:0:0:0:0:0:0:0", ipText(zero6, false));
    EXPECT_EQ("fe80:0:0:0:0:0:0:1", ipText(one6, false));
    EXPECT_EQ("ffff:ffff:ffff:ffff:ffff:ffff:ffff:ffff", ipText(full6, false));
}

TEST(CmdBuffer, ComposeFillsTheTrailerByBodyKind) {
    struct Case {
        CmdBuffer buffer;
        uint32_t targetModule, length;
    };
    OSAL_NetAddress addr = address("10.0.0.1", 6000);
    unsigned char bytes[kCmdBufferCapacity];
    memset(bytes, 0xAB, sizeof(bytes));
    const Case cases[] = {{*std::unique_ptr<CmdBuffer>(BindToNet(&addr, 9)), 1, kVprNetBindSize},
                          {bufferOf(streamRecord(sampleStart())), 0, kVtspCommandSize},
                          // An unknown body kind carries nothing.
                          {CmdBuffer(static_cast<VPR_CommType>(3), bytes), 0, 0}};
    for (const Case& k : cases) {
        SCOPED_TRACE(k.length);
        ASSERT_EQ(k.length, k.buffer.length);
        VPR_Comm out{};
        k.buffer.compose(&out);
        EXPECT_EQ(k.targetModule, out.targetModule);
        EXPECT_EQ(0u, out.type);
        EXPECT_EQ(3664u, out.recordLength);
        EXPECT_EQ(0, memcmp(out.body, k.buffer.getCmd(), k.length));
        for (size_t i = k.length; i < kVprCommBodySize; ++i) ASSERT_EQ(0, out.body[i]) << i;
    }
    EXPECT_EQ(kVprType1Size, CmdBuffer(VPR_COMM_TYPE1, bytes).length);
}

TEST(CmdBuffer, PrintDumpsStreamCommandsOnly) {
    LogCapture log;
    StreamCommand c = sampleStart();
    c.localAddr = address("10.0.0.1", 6000);
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

    // A URI filling all 128 bytes without a terminator is cut at its field:
    // "abcd" in confMask right behind it is not part of the dump.
    log.clear();
    c.extmapUri = std::string(200, 'u');
    c.confMask = 0x64636261;
    bufferOf(streamRecord(c)).print();
    ASSERT_FALSE(log.linesWithTag("cmdbuffer").empty());
    const std::string dump = log.linesWithTag("cmdbuffer")[0].text;
    EXPECT_NE(std::string::npos, dump.find("extmapUri " + std::string(128, 'u') + "\n"));
    EXPECT_EQ(std::string::npos, dump.find("abcd"));

    // Configuration commands and other codes below 79 are never dumped.
    log.clear();
    CmdBuffer(VPR_COMM_VTSP_CMD, configRecord(ConfigCommand()).body).print();
    CmdBuffer(VPR_COMM_VTSP_CMD, commandRecord(78).body).print();
    CmdBuffer(VPR_COMM_VTSP_CMD, commandRecord(-5).body).print();
    EXPECT_EQ(3u, log.linesWithTag("cmdbuffer").size());  // only the three destructor lines
    for (const LogLine& line : log.lines()) EXPECT_EQ(ANDROID_LOG_DEBUG, line.priority);

}

TEST(CmdBuffer, CopiesCarryTheBodyAndTheDestructorLogsBothCounts) {
    LogCapture log;
    const CmdBuffer source = bufferOf(streamRecord(sampleStart()));
    EXPECT_TRUE(same(source, CmdBuffer(source)));
    const int32_t con0 = CmdBuffer::con.load(), des0 = CmdBuffer::des.load();
    {
        CmdBuffer assigned;
        assigned = source;  // counts as a construction
        EXPECT_TRUE(same(source, assigned));
    }
    EXPECT_TRUE(log.contains(ANDROID_LOG_DEBUG, "cmdbuffer",
                             "~CmdBuffer: " + std::to_string(des0 + 1) + "/" + std::to_string(con0 + 2)));
}
