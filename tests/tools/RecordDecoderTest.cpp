// Decoding records as `vtsp decode` and the simulator's timeline show them:
// host-order values, every target module, unknown codes and types, whole
// streams with trailing bytes, and arbitrary bytes.
#include <gtest/gtest.h>

#include <cstring>
#include <random>
#include <sstream>

#include "RecordDecoder.h"
#include "StepSyntax.h"
#include "VtspRecord.h"
#include "WireBytes.h"

using android::VPR_Comm;

namespace {

VPR_Comm recordOf(const std::string& step) {
    StepSyntax::Step parsed;
    std::string error;
    EXPECT_TRUE(StepSyntax::parse(step, &parsed, &error)) << error;
    return parsed.record();
}

// A bind request as the link writes it, byte by byte: ports and IPv6 groups big-endian.
VPR_Comm bindRecord(int32_t stream, const std::string& endpoint) {
    using namespace vtspwire;
    android::OSAL_NetAddress addr{};
    EXPECT_TRUE(vtspcodec::parseEndpoint(endpoint, &addr));
    VPR_Comm record{};
    uint8_t* b = reinterpret_cast<uint8_t*>(&record);
    putLe32(b, kBindCode, android::VPR_NET_CMD_BIND);
    putLe32(b, kBindStreamId, static_cast<uint32_t>(stream));
    memcpy(b + kBindAddr + kAddrIpv4, addr.ipv4, sizeof(addr.ipv4));
    for (size_t i = 0; i < 8; ++i) putBe16(b, kBindAddr + kAddrIpv6 + 2 * i, addr.ipv6[i]);
    putBe16(b, kBindAddr + kAddrPort, addr.port);
    putLe32(b, kBindAddr + kAddrType, addr.type);
    putLe32(b, kTargetOffset, android::VPMD_NET_TARGET);
    putLe32(b, kLengthOffset, kRecordSize);
    return record;
}

std::string described(const VPR_Comm& record) {
    std::string out;
    for (const std::string& line : RecordDecoder::describe(record, 3)) out += line + "\n";
    return out;
}

}  // namespace

TEST(RecordDecoderSummary, OneLinePerTargetModule) {
    EXPECT_EQ("START stream 1 sendrecv 10.0.0.1:6000 <-> 192.168.1.2:5000 pt 96 bw 500",
              RecordDecoder::summary(recordOf("start stream=1 local=10.0.0.1:6000 remote=192.168.1.2:5000 bw=500")));
    EXPECT_EQ("MODIFY stream 2 inactive [fe80::1]:4000 <-> no address (type 4) pt 97",
              RecordDecoder::summary(recordOf("modify stream=2 dir=inactive local=[fe80::1]:4000 pt=97")));
    EXPECT_EQ("END stream 3", RecordDecoder::summary(recordOf("end stream=3")));
    EXPECT_EQ("CONFIG stream 1 rtcp 0x50 (NACK FIR)", RecordDecoder::summary(recordOf("config stream=1 rtcp=0x50")));
    EXPECT_EQ("BIND stream 1 10.0.0.1:6000", RecordDecoder::summary(bindRecord(1, "10.0.0.1:6000")));
    EXPECT_EQ("LIVENESS (modem is active)", RecordDecoder::summary(recordOf("raw target=8")));
    EXPECT_EQ("target 5 (unknown) body 2a 00 00 00 00 00 00 00", RecordDecoder::summary(recordOf("raw target=5 code=42")));
    EXPECT_EQ("code 42 (unknown command)", RecordDecoder::summary(recordOf("raw target=0 code=42")));
    EXPECT_EQ("END stream 3 [type 2: dropped]", RecordDecoder::summary(recordOf("end stream=3 type=2")));
}

TEST(RecordDecoderDescribe, FieldsInHostOrderAndUnknownThingsNamedWithAnExcerpt) {
    const std::string start = described(recordOf(
            "start stream=1 local=10.0.0.1:6000 remote=[2001:db8::2]:5000 pt=96,97 bw=500 rbw=400 ext=3 rtcp-ports=6001:5001"));
    VPR_Comm shifted = recordOf("end stream=1");
    shifted.recordLength = 0x500e0000;
    const std::pair<std::string, std::string> rows[] = {
            {start, "record 3  type 0  targetModule 0 (video command)  recordLength 3664\n"},
            {start, "  START (code 81)  infc 0\n"},
            {start, "  stream 1  dir 4 sendrecv  encoder 0\n"},
            {start, "  payload types 96, 97\n"},
            {start, "  local  10.0.0.1:6000  rtcp 6001  type 0 (IPv4)\n"},
            {start, "  remote [2001:db8::2]:5000  rtcp 5001  type 2 (IPv6)\n"},
            {start, "  bandwidth local 500 kbps, remote 400 kbps\n"},
            {start, "  extension 0  extmap id 3 uri \"urn:3gpp:video-orientation\"\n"},
            {start, "  step: start stream=1 dir=sendrecv local=10.0.0.1:6000 remote=[2001:db8::2]:5000 pt=96,97 bw=500 "
                    "rbw=400 ext=3 rtcp-ports=6001:5001\n"},
            {described(bindRecord(4, "[fe80::9]:7000")), "  BIND (code 7)  stream 4  address [fe80::9]:7000  type 2 (IPv6)\n"},
            {described(recordOf("config stream=2 rtcp=0x91 on=0")),
             "  template 23 (RTCP feedback)  on 0  stream 2  mask 0x91 (NACK TMMBR +ignored)\n"},
            {described(recordOf("raw target=0 code=42")), "  unknown command (code 42)  infc 0\n  body: 2a 00 00 00"},
            {described(recordOf("raw target=9 code=1")), "unknown target module: the link drops it; body: 01 00 00 00"},
            {described(recordOf("start stream=1 type=5")), "type 5: the link drops video commands whose type is not 0"},
            {described(shifted), "(not 3664: if the trailer looks like body bytes"},
    };
    for (const auto& [text, part] : rows) EXPECT_NE(std::string::npos, text.find(part)) << part;
}

TEST(RecordDecoderStream, TrailingBytesAreExplainedAndShown) {
    // The counts are checked on arbitrary streams below, the exit status by the vtsp CTest entry.
    const VPR_Comm records[] = {recordOf("start stream=1 local=10.0.0.1:6000"), recordOf("end stream=1")};
    std::istringstream in(std::string(reinterpret_cast<const char*>(records), sizeof(records)) + std::string(10, '\x07'));
    std::ostringstream out;
    RecordDecoder::decodeStream(in, out);
    EXPECT_NE(std::string::npos, out.str().find("trailing 10 bytes after 2 whole records (7338 bytes is not a multiple "
                                                "of 3664): 07 07 07 07 07 07 07 07 07 07\n"));
}

TEST(RecordDecoderStream, ArbitraryBytesDecodeWithoutFault) {
    std::mt19937 random(99);
    for (int i = 0; i < 300; ++i) {
        std::string bytes(random() % (3 * android::kVprCommSize), '\0');
        for (char& c : bytes) c = static_cast<char>(random() % 256);
        // Steer some records into each target module and known code.
        for (size_t at = 0; at + android::kVprCommSize <= bytes.size(); at += android::kVprCommSize) {
            const uint32_t targets[] = {0, 1, 8, static_cast<uint32_t>(random())};
            const int32_t codes[] = {15, 81, 82, 88, 7};
            const uint32_t target = targets[random() % 4];
            const int32_t code = codes[random() % 5];
            memcpy(&bytes[at + 3656], &target, sizeof(target));
            if (random() % 2) memcpy(&bytes[at], &code, sizeof(code));
        }
        std::istringstream in(bytes);
        std::ostringstream out, steps;
        const RecordDecoder::StreamResult result = RecordDecoder::decodeStream(in, out);
        EXPECT_EQ(bytes.size() / android::kVprCommSize, result.records);
        EXPECT_EQ(bytes.size() % android::kVprCommSize, result.trailingBytes);
        std::istringstream again(bytes);
        RecordDecoder::decodeStream(again, steps, true);
    }
}
