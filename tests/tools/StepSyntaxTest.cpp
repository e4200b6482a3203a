// The step syntax as `vtsp encode` and the scenarios use it: the records it
// builds (checked byte by byte against the documented layout), the text it
// formats back, and the complaints it makes about bad steps.
#include <gtest/gtest.h>

#include <cstring>

#include "StepSyntax.h"

using android::VPR_Comm;
using android::VtspCommand;

namespace {

StepSyntax::Step parsed(const std::string& text) {
    StepSyntax::Step step;
    std::string error;
    EXPECT_TRUE(StepSyntax::parse(text, &step, &error)) << text << ": " << error;
    return step;
}

std::string errorOf(const std::string& text) {
    StepSyntax::Step step;
    std::string error;
    EXPECT_FALSE(StepSyntax::parse(text, &step, &error)) << text;
    return error;
}

VtspCommand bodyOf(const VPR_Comm& record) {
    VtspCommand body;
    memcpy(&body, record.body, sizeof(body));
    return body;
}

std::vector<uint8_t> bytesAt(const VPR_Comm& record, size_t offset, size_t count) {
    const uint8_t* p = reinterpret_cast<const uint8_t*>(&record) + offset;
    return std::vector<uint8_t>(p, p + count);
}

}  // namespace

TEST(StepSyntaxRecord, StartFollowsTheDocumentedWireLayout) {
    const VPR_Comm r = parsed("start stream=1 dir=sendrecv local=10.0.0.1:6000 remote=192.168.1.2:5000 pt=96 bw=500 "
                              "rbw=500 ext=3 rtcp-ports=6001:5001")
                               .record();
    EXPECT_EQ((std::vector<uint8_t>{0x51, 0, 0, 0, 0, 0, 0, 0, 1, 0, 0, 0, 4, 0, 0, 0}), bytesAt(r, 0, 16));
    EXPECT_EQ((std::vector<uint8_t>{0x60, 0, 0, 0}), bytesAt(r, 0x38, 4));
    EXPECT_EQ((std::vector<uint8_t>{3, 0, 0, 0, 'u', 'r', 'n', ':'}), bytesAt(r, 0x4C, 8));
    EXPECT_EQ((std::vector<uint8_t>{0xc0, 0xa8, 0x01, 0x02}), bytesAt(r, 0xD8, 4));
    EXPECT_EQ((std::vector<uint8_t>{0x13, 0x88}), bytesAt(r, 0xEC, 2));  // remote port, big-endian
    EXPECT_EQ((std::vector<uint8_t>{0x13, 0x89}), bytesAt(r, 0xF4, 2));  // remote RTCP port
    EXPECT_EQ((std::vector<uint8_t>{0x0a, 0, 0, 1}), bytesAt(r, 0xF8, 4));
    EXPECT_EQ((std::vector<uint8_t>{0x17, 0x70}), bytesAt(r, 0x10C, 2));
    EXPECT_EQ((std::vector<uint8_t>{0x17, 0x71}), bytesAt(r, 0x114, 2));
    EXPECT_EQ((std::vector<uint8_t>{0xf4, 0x01, 0, 0, 0xf4, 0x01, 0, 0}), bytesAt(r, 0x118, 8));
    EXPECT_EQ((std::vector<uint8_t>{0, 0, 0, 0, 0, 0, 0, 0, 0x50, 0x0e, 0, 0}), bytesAt(r, 0xE44, 12));
}

TEST(StepSyntaxRecord, DirectionsByNameOrNumberAndCodesByStep) {
    // sendrecv is in the layout above; recvonly is decoded by the vtsp CTest entry.
    EXPECT_EQ(1u, bodyOf(parsed("modify stream=2 dir=inactive").record()).u.stmVideo.dir);
    EXPECT_EQ(7u, bodyOf(parsed("modify stream=2 dir=7").record()).u.stmVideo.dir);
    EXPECT_EQ(82, bodyOf(parsed("modify stream=2").record()).code);
    EXPECT_EQ(88, bodyOf(parsed("end stream=2").record()).code);
    EXPECT_EQ(16u, bodyOf(parsed("start stream=0x10").record()).u.stmVideo.streamId);
}

TEST(StepSyntaxRecord, Ipv6AddressesBracketedOrBareTravelBigEndian) {
    for (const char* text : {"start stream=1 local=[2001:db8::1]:6000 remote=[fe80::2:3]:5000",
                             "start stream=1 local=2001:db8::1:6000 remote=fe80::2:3:5000"}) {
        const VPR_Comm r = parsed(text).record();
        EXPECT_EQ((std::vector<uint8_t>{0xfe, 0x80, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0x02, 0, 0x03, 0x13, 0x88}),
                  bytesAt(r, 0xDC, 18))
                << text;
        EXPECT_EQ((std::vector<uint8_t>{2, 0, 0, 0}), bytesAt(r, 0xF0, 4)) << text;
        EXPECT_EQ((std::vector<uint8_t>{0x20, 0x01, 0x0d, 0xb8, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0x01, 0x17, 0x70}),
                  bytesAt(r, 0xFC, 18))
                << text;
    }
}

TEST(StepSyntaxRecord, ConfigAndRawFillTheirViewsAndTrailer) {
    const VPR_Comm config = parsed("config stream=-0x4 rtcp=0xd0 on=0 templ=9 type=2").record();
    const VtspCommand body = bodyOf(config);
    EXPECT_EQ(15, body.code);
    EXPECT_EQ(9u, body.u.config.templCode);
    EXPECT_EQ((std::vector<int16_t>{0, -4, 0xd0}), std::vector<int16_t>(body.u.config.data, body.u.config.data + 3));
    EXPECT_EQ(2u, config.type);

    const VPR_Comm raw = parsed("raw target=8 type=3 code=-5").record();
    EXPECT_EQ(8u, raw.targetModule);
    EXPECT_EQ(3u, raw.type);
    EXPECT_EQ(-5, bodyOf(raw).code);
    EXPECT_EQ(3664u, raw.recordLength);
}

TEST(StepSyntaxText, FormattedStepsBuildTheSameRecord) {
    for (const char* text : {"start stream=1 dir=sendrecv local=10.0.0.1:6000 remote=192.168.1.2:5000 bw=500 ext=3",
                             "modify stream=9 dir=inactive local=[fe80::1]:4000 pt=97,98 encoder=1 rbw=64",
                             "start stream=2 dir=sendonly ext=5:urn:example:other rtcp-ports=7:8 type=1",
                             "end stream=4294967295", "config stream=-3 rtcp=0xffff on=2 templ=1",
                             "raw target=77 type=1 code=81"}) {
        const VPR_Comm record = parsed(text).record();
        EXPECT_TRUE(StepSyntax::exact(record)) << text;
        const VPR_Comm again = parsed(StepSyntax::format(StepSyntax::fromRecord(record))).record();
        EXPECT_EQ(0, memcmp(&record, &again, sizeof(record))) << text;
    }
    // Fields come back in one order, defaults left out.
    EXPECT_EQ("start stream=1 dir=sendrecv local=10.0.0.1:6000 ext=3",
              StepSyntax::format(StepSyntax::fromRecord(parsed("start ext=3 local=10.0.0.1:6000 stream=1 pt=96").record())));
    // A record with fields no key sets is not exact.
    VPR_Comm record = parsed("start stream=1").record();
    record.body[4] = 7;  // infc
    EXPECT_FALSE(StepSyntax::exact(record));
    EXPECT_EQ("start stream=1 dir=sendrecv", StepSyntax::format(StepSyntax::fromRecord(record)));
}

TEST(StepSyntaxErrors, NameWhatWasExpectedAndWhatWasFound) {
    const std::pair<std::string, std::string> cases[] = {
            {"", "expected a step (start, modify, end, config, raw) but found end of line"},
            {"stop stream=1", "expected a step (start, modify, end, config, raw) but found 'stop'"},
            {"start", "expected stream=N (0..4294967295) but found end of line"},
            {"start stream=-1", "expected stream=N (0..4294967295) but found 'stream=-1'"},
            {"start stream=99999999999999999999", "expected stream=N (0..4294967295) but found 'stream=99999999999999999999'"},
            {"start stream=1 dir=sideways", "expected dir=ended|inactive|sendonly|recvonly|sendrecv or a number but "
                                            "found 'dir=sideways'"},
            {"start stream=1 local=10.0.0.1:70000", "expected local=IP:PORT but found 'local=10.0.0.1:70000'"},
            {"start stream=1 stream=2", "expected stream= only once but found 'stream=2'"},
            {"start stream=1 rtcp=3", "expected a field of start (stream=, dir=, local=, remote=, pt=, encoder=, bw=, "
                                      "rbw=, ext=, rtcp-ports=, type=) but found 'rtcp=3'"},
            {"config stream=1", "expected rtcp=MASK (0..0xffff) but found end of line"},
            {"config stream=40000 rtcp=1", "expected stream=N (-32768..32767) but found 'stream=40000'"},
            {"start stream=1 ext=3:" + std::string(129, 'u'),
             "expected ext=ID or ID:URI (URI up to 128 characters) but found 'ext=3:uuuuuuuuuuuuuuuuuuuuuuuuuuuuuuuuuu...'"},
    };
    for (const auto& c : cases) EXPECT_EQ(c.second, errorOf(c.first)) << c.first;
}

