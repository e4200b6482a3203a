// `dumpsys VideoCallEngineService` as a client sends it: the dump transaction
// with a descriptor and arguments. The sections through a call's start,
// modify, end and release; who may read them; the link's counters after
// failing reads and writes and refused commands; the history's last 32.
#include <fcntl.h>
#include <unistd.h>

#include <gmock/gmock.h>

#include <atomic>
#include <future>
#include <sstream>
#include <thread>

#include "EngineTestUtil.h"
#include "HostBinder.h"

using namespace android;
using namespace enginecase;
using namespace std::chrono_literals;

namespace {

constexpr const char* kImage = "/data/vce/hold.png";
constexpr const char* kOrientationUri = "urn:3gpp:video-orientation";

std::string dump(const std::vector<std::string>& args = {}) {
    status_t status = UNKNOWN_ERROR;
    const std::string text = hostbinder::dumpsys(enginetest::service(), args, &status);
    EXPECT_EQ(NO_ERROR, status);
    return text;
}

// The lines of one section, its heading first.
Strings section(const std::string& text, const std::string& heading) {
    Strings out;
    std::istringstream in(text);
    bool inside = false;
    for (std::string line; std::getline(in, line);) {
        if (line.empty() || line[0] != ' ') inside = line.compare(0, heading.size(), heading) == 0;
        if (inside) out.push_back(line);
    }
    return out;
}
// The one line of a section that starts with `key`.
std::string field(const std::string& text, const std::string& heading, const std::string& key) {
    for (const std::string& line : section(text, heading)) {
        if (line.compare(0, key.size(), key) == 0) return line;
    }
    return "(no " + key + ")";
}

// The call's commands carry its bandwidth and the orientation extension.
void modemSends(int32_t code, uint32_t streamId, uint32_t dir = VTSP_STREAM_DIR_SENDRECV, uint16_t remotePort = 5000) {
    vtspcodec::StreamCommand c = streamCommand(code, streamId, dir, remotePort);
    c.localVideoAsBwKbps = 500;
    c.extmapId = 3;
    c.extmapUri = kOrientationUri;
    enginecase::modemSends(c);
}

class DumpTest : public EngineCase {
protected:
    void TearDown() override {
        hostbinder::clearClientIdentity();
        hostbinder::clearPermissions();
        EngineCase::TearDown();
    }
    // Waits until the history has seen `count` commands in all.
    void handled(size_t count) {
        const std::string line = "recent commands: " + std::to_string(count) + " handled";
        EXPECT_TRUE(eventually([&] { return dump({"--history"}).compare(0, line.size(), line) == 0; }))
                << dump({"--history"});
    }
};

}  // namespace

TEST_F(DumpTest, SectionsFollowACallThroughStartModifyEndAndRelease) {
    sp<hostbinder::RemoteBinder> client = setCallback();
    ASSERT_EQ(0, setCamera(1));
    setSurface(kRemoteView);
    setSurface(kLocalView);
    orient(90, 1, 1);
    hide(kImage);
    EXPECT_EQ((Strings{"engine:", "  callback: registered, binder alive", "  camera: id 1, open 1, handle 0x100",
                       "  camera config: 2, preview size 480x640 at 30 fps",
                       "  orientation: device 90, screen 1, auto-rotate 1", "  angles: camera 270, display 180, remote 0",
                       "  surfaces: remote set, preview set",
                       "  renders: \"Remote\" \"Camera 1, Facing front, Orientation 270\"",
                       "  hidden image: \"/data/vce/hold.png\"", "  uplink qos: 0 bit/s", "  loopback: off, stream 0"}),
              section(dump({"--engine"}), "engine:"));

    modemSends(_VTSP_CMD_STREAM_VIDEO_START, 7);
    VPR_Comm bind{};
    ASSERT_TRUE(enginetest::modem().readRecord(&bind));
    handled(1);
    const Strings started{"streams: 1",
                          "  stream 7:",
                          "    media engine stream: 1",
                          "    direction: sendrecv (3)",
                          "    local: 10.0.0.1:6000",
                          "    remote: 192.168.1.2:5000",
                          "    codec: H264, payload type 96, camera config 2",
                          "    bit rate: 600000, rate control 100000..512000 bit/s, 20..30 fps",
                          "    rtcp feedback: 0xd0 nack fir tmmbr",
                          "    orientation extension: id 3",
                          "    processing starts: 1",
                          "    capture: \"Camera 1, Facing front, Orientation 270\", render: \"Remote\""};
    EXPECT_EQ(started, section(dump(), "streams:"));

    // A modify to send-only with a new remote port.
    modemSends(_VTSP_CMD_STREAM_VIDEO_MODITY, 7, VTSP_STREAM_DIR_SENDONLY, 5002);
    handled(2);
    Strings modified = started;
    modified[3] = "    direction: sendonly (1)";
    modified[5] = "    remote: 192.168.1.2:5002";
    EXPECT_EQ(modified, section(dump({"--streams"}), "streams:"));

    // A second stream's commands leave the first one's entry as it was.
    modemSends(_VTSP_CMD_STREAM_VIDEO_START, 8, VTSP_STREAM_DIR_SENDRECV, 5004);
    ASSERT_TRUE(enginetest::modem().readRecord(&bind));
    handled(3);
    const Strings two = section(dump({"--streams"}), "streams:");
    ASSERT_EQ(2 * modified.size() - 1, two.size());
    EXPECT_EQ("streams: 2", two[0]);
    EXPECT_EQ(Strings(modified.begin() + 1, modified.end()), Strings(two.begin() + 1, two.begin() + modified.size()));
    EXPECT_EQ("  stream 8:", two[modified.size()]);

    for (uint32_t id : {8u, 7u}) modemSends(_VTSP_CMD_STREAM_VIDEO_END, id);
    handled(5);
    EXPECT_EQ((Strings{"streams: 0"}), section(dump({"--streams"}), "streams:"));
    const Strings history = section(dump({"--history"}), "recent commands:");
    ASSERT_EQ(6u, history.size());
    EXPECT_THAT(history[1], ::testing::MatchesRegex("  #1 [0-9]+\\.[0-9]{3} s START 81, stream 7 -> bind 10\\.0\\.0\\.1:6000"));
    EXPECT_THAT(history[2], ::testing::MatchesRegex("  #2 [0-9]+\\.[0-9]{3} s MODIFY 82, stream 7 -> none"));
    EXPECT_THAT(history[5], ::testing::MatchesRegex("  #5 [0-9]+\\.[0-9]{3} s END 88, stream 7 -> none"));

    send(kRelease);
    settleRemovals();
    EXPECT_EQ((Strings{"engine:", "  callback: none", "  camera: id -1, open -1, handle 0x0",
                       "  camera config: 2, preview size 480x640 at 30 fps",
                       "  orientation: device 0, screen 0, auto-rotate 1", "  angles: camera 0, display 0, remote 0",
                       "  surfaces: remote none, preview none", "  renders: none",
                       "  hidden image: \"/data/vce/hold.png\"", "  uplink qos: 0 bit/s", "  loopback: off, stream 0"}),
              section(dump({"--engine"}), "engine:"));
}

// Arguments select sections; callers the permission controller refuses get
// one line, root and the process itself need no grant.
TEST_F(DumpTest, ArgumentsSelectSectionsAndOnlyPermittedCallersRead) {
    auto headings = [](const std::string& text) {
        Strings out;
        std::istringstream in(text);
        for (std::string line; std::getline(in, line);) {
            if (!line.empty() && line[0] != ' ') out.push_back(line.substr(0, line.find(':') + 1));
        }
        return out;
    };
    const Strings all{"engine:", "modem link:", "streams:", "recent commands:"};
    EXPECT_EQ(all, headings(dump()));
    EXPECT_EQ(all, headings(dump({"-a"})));  // a bug report's argument is not a section
    EXPECT_EQ((Strings{"modem link:"}), headings(dump({"--link"})));
    EXPECT_EQ((Strings{"streams:", "recent commands:"}), headings(dump({"--history", "--streams"})));
    const std::string usage = dump({"--link", "-h"});
    EXPECT_EQ(0u, usage.find("usage: dumpsys VideoCallEngineService [-h] [--engine] [--link] [--streams] [--history]\n"));
    for (const char* option : {"--engine", "--link", "--streams", "--history"}) {
        EXPECT_NE(std::string::npos, usage.find(std::string("\n  ") + option + " ")) << option;
    }

    hostbinder::setClientIdentity(4242, 2000);
    EXPECT_EQ("Permission Denial: can't dump VideoCallEngineService from pid=4242, uid=2000\n", dump({"--link"}));
    hostbinder::setPermission("android.permission.DUMP", 2000, true);
    EXPECT_EQ((Strings{"modem link:"}), headings(dump({"--link"})));
    hostbinder::setClientIdentity(4243, 10057);
    EXPECT_EQ("Permission Denial: can't dump VideoCallEngineService from pid=4243, uid=10057\n", dump());
}

// Reads fail while the link's descriptor is write-only and writes while it
// is read-only; commands that arrive while the link is stopped are refused.
TEST_F(DumpTest, LinkCountersShowFailuresRetriesAndRefusedCommands) {
    VtspManager& vm = *engine()->mVtspManager;
    const int device = vm.mFd;
    const char* path = enginetest::modem().devicePath();
    const int readWrite = open(path, O_RDWR | O_NOCTTY), readOnly = open(path, O_RDONLY | O_NOCTTY),
              writeOnly = open(path, O_WRONLY | O_NOCTTY);
    ASSERT_TRUE(readWrite >= 0 && readOnly >= 0 && writeOnly >= 0);
    const std::string link = "modem link:";
    EXPECT_EQ("  device: " + std::string(path) + ", open", field(dump(), link, "  device:"));
    EXPECT_EQ("  threads: tVtspCmdRx running, tVtspCmdHd running, tVtspCmdTx running",
              field(dump(), link, "  threads:"));

    // A start whose bind request cannot be written at first.
    ASSERT_EQ(device, dup2(readOnly, device));
    modemSends(_VTSP_CMD_STREAM_VIDEO_START, 1);
    ASSERT_TRUE(eventually([&] { return field(dump(), link, "  written:").find(" 0 failures") == std::string::npos; }));
    ASSERT_EQ(device, dup2(readWrite, device));
    VPR_Comm bind{};
    ASSERT_TRUE(enginetest::modem().readRecord(&bind));
    ASSERT_TRUE(eventually([&] { return field(dump(), link, "  written:").find("1 records") != std::string::npos; }));
    const std::string written = field(dump(), link, "  written:");
    EXPECT_THAT(written, ::testing::MatchesRegex(
                                 "  written: 1 records, 3664 bytes, [1-9][0-9]* failures, last error errno 9, Bad file descriptor"));

    // Two commands while stopped, then reads that fail: the read in progress
    // keeps the old descriptor and takes the first record after the swap.
    vm.stop();
    for (uint32_t id : {2u, 3u}) modemSends(_VTSP_CMD_STREAM_VIDEO_END, id);
    ASSERT_TRUE(eventually([&] { return field(dump(), link, "  refused") == "  refused while stopped: 2 commands, 0 replies"; }))
            << dump({"--link"});
    vm.start();
    ASSERT_EQ(device, dup2(writeOnly, device));
    modemSends(_VTSP_CMD_STREAM_VIDEO_END, 4);
    ASSERT_TRUE(eventually([&] { return field(dump(), link, "  read:").find(" 0 failures") == std::string::npos; }));
    ASSERT_EQ(device, dup2(readWrite, device));
    modemSends(_VTSP_CMD_STREAM_VIDEO_END, 5);
    handled(3);  // the start and the two ends accepted while running

    const std::string text = dump({"--link"});
    EXPECT_THAT(field(text, link, "  read:"),
                ::testing::MatchesRegex("  read: 5 records, 18320 bytes, [1-9][0-9]* failures, last error errno 9, "
                                        "Bad file descriptor"));
    EXPECT_EQ(written, field(text, link, "  written:"));
    // Each failure was tried again; at least one command waited in each queue.
    EXPECT_THAT(field(text, link, "  retries:"), ::testing::MatchesRegex("  retries: [1-9][0-9]*"));
    EXPECT_THAT(field(text, link, "  receive queue:"), ::testing::MatchesRegex("  receive queue: 0 now, [1-9][0-9]* at most"));
    EXPECT_THAT(field(text, link, "  transmit queue:"), ::testing::MatchesRegex("  transmit queue: 0 now, 1 at most"));
    for (int fd : {readWrite, readOnly, writeOnly}) close(fd);
}

TEST_F(DumpTest, HistoryKeepsTheLast32Commands) {
    constexpr uint32_t kCommands = 40;
    for (uint32_t id = 1; id <= kCommands; ++id) modemSends(_VTSP_CMD_STREAM_VIDEO_END, 100 + id);
    handled(kCommands);
    const Strings history = section(dump({"--history"}), "recent commands:");
    ASSERT_EQ(33u, history.size());
    EXPECT_EQ(0u, history[0].find("recent commands: 40 handled, last 32 shown, now "));
    double previous = 0;
    for (uint32_t n = 9; n <= kCommands; ++n) {
        const std::string& line = history[n - 8];
        const std::string number = "  #" + std::to_string(n) + " ";
        ASSERT_EQ(0u, line.find(number)) << line;
        EXPECT_NE(std::string::npos, line.find(" s END 88, stream " + std::to_string(100 + n) + " -> none")) << line;
        const double at = std::stod(line.substr(number.size()));
        EXPECT_GE(at, previous) << line;  // monotonic
        previous = at;
    }
}

// A client that does not answer a notification holds the callback lock: the
// dump reports that part as not read and prints the rest without waiting.
TEST_F(DumpTest, AClientStuckInANotificationDoesNotHoldUpTheDump) {
    std::promise<void> answer;
    std::shared_future<void> answered = answer.get_future().share();
    std::atomic<bool> notified{false};
    sp<hostbinder::RemoteBinder> stuck = new hostbinder::RemoteBinder(
            [&](uint32_t, const Parcel&, Parcel* reply, uint32_t) {
                notified = true;
                answered.wait();
                reply->writeInt32(0);
                return NO_ERROR;
            },
            String16("android.videocallengine.callback"));
    send(kSetCallback, {}, stuck);
    std::thread media([] { mmeEvent(22); });
    ASSERT_TRUE(eventually([&] { return notified.load(); }));
    const std::string text = dump();
    answer.set_value();
    media.join();
    EXPECT_EQ("  callback: not read, a notification held it for more than 100 ms", field(text, "engine:", "  callback:"));
    EXPECT_EQ("  camera: id -1, open -1, handle 0x0", field(text, "engine:", "  camera:"));
    EXPECT_EQ("streams: 0", field(text, "streams:", "streams:"));
    EXPECT_EQ("  callback: registered, binder alive", field(dump({"--engine"}), "engine:", "  callback:"));
    send(kCleanCallback);
}
