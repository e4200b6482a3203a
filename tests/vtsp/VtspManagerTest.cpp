// The modem command link run on a raw pseudo-terminal with its real threads:
// record assembly and routing, a whole call from the modem's side, pausing,
// shutdown in every state, a flood held back at the pipe, an unusable device,
// SIGUSR1 storms and a device that refuses writes for a while. Every record
// accepted while the link runs is handled exactly once and every reply is
// written whole. Random record bodies through the dispatcher and the streams
// are fuzz_records' part.
#include <android/log.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <pthread.h>
#include <signal.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <filesystem>
#include <fstream>
#include <future>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "Eventually.h"
#include "HostFakes.h"
#include "LogCapture.h"
#include "ModemPty.h"
#include "WatchedThreads.h"
#include "VtspManager.h"
#include "VtspRecord.h"

using namespace android;
using namespace vtspcodec;
using namespace std::chrono_literals;
using Clock = std::chrono::steady_clock;
using V = std::vector<std::string>;

namespace {

const char* const kTag = "VTSPManager";
const char* const kRxEntry = "cmdRxFunc: cmdRxFunc E";
const char* const kTxEntry = "cmdTxFunc: cmdTxFunc: E";
const char* const kHdEntry = "cmdHandleFunc: cmdHandleFunc: E";
const char* const kWritten = "cmdTxFunc, write Data to VPR";
const char* const kRefused = "pushAndSignal: failed to push elem";
const std::string kWholeBind = "target 1, type 0, length 3664, code 7: ";
const char* const kReadFailed = "readFromVpr: cmdRxFunc: failed to read file, error ";

// How many of our threads carry `name` and, unless `state` is 0, are in that
// scheduler state ('S' while asleep in the kernel).
size_t threadsNamed(const std::string& name, char state = 0) {
    size_t n = 0;
    for (const auto& entry : std::filesystem::directory_iterator("/proc/self/task")) {
        std::ifstream commFile(entry.path() / "comm"), statFile(entry.path() / "stat");
        std::string comm, stat((std::istreambuf_iterator<char>(statFile)), std::istreambuf_iterator<char>());
        std::getline(commFile, comm);
        const size_t paren = stat.rfind(')');
        n += comm == name && (state == 0 || (paren != std::string::npos && paren + 2 < stat.size() &&
                                             stat[paren + 2] == state));
    }
    return n;
}

// True when each of the link's three threads exists exactly `count` times.
bool linkThreads(size_t count, char state = 0) {
    for (const char* name : {"tVtspCmdRx", "tVtspCmdHd", "tVtspCmdTx"}) {
        if (threadsNamed(name, state) != count) return false;
    }
    return true;
}

// Waits until the media engine has been asked `text`.
bool called(const std::string& text) {
    return eventually([&] {
        const V calls = hostfakes::callTexts();
        return std::find(calls.begin(), calls.end(), text) != calls.end();
    });
}

// Descriptors of this process that are open on `path`.
size_t openDescriptorsOn(const std::string& path) {
    size_t n = 0;
    for (const auto& entry : std::filesystem::directory_iterator("/proc/self/fd")) {
        std::error_code ec;
        n += std::filesystem::read_symlink(entry.path(), ec) == path;
    }
    return n;
}

StreamCommand startCommand(uint32_t streamId, const char* localIp = "10.0.0.1", uint16_t localPort = 6000) {
    StreamCommand c;
    c.code = _VTSP_CMD_STREAM_VIDEO_START;
    c.streamId = streamId;
    c.localAddr = address(localIp, localPort);
    c.remoteAddr = address("192.168.1.2", 5000);
    return c;
}

// The reply to a start of stream `id` from startCommand's local end.
std::string bindOf(uint32_t id) { return kWholeBind + "stream " + std::to_string(id) + " at 10.0.0.1:6000"; }

std::string recvLine(int msg, int target) {
    return "cmdRxFunc, recv msg " + std::to_string(msg) + ", targetModule " + std::to_string(target);
}

// Destroys its link exactly once, also when a test stops half-way.
class ScopedLink {
public:
    explicit ScopedLink(const char* path) : link(path) {}
    ~ScopedLink() { destroy(); }
    bool init() {
        mRunning = true;
        return link.init();
    }
    void destroy() {
        if (mRunning) link.destroy();
        mRunning = false;
    }
    VtspManager link;

private:
    bool mRunning = false;
};

class VtspManagerTest : public ::testing::Test {
protected:
    void SetUp() override { hostfakes::reset(); }
    void TearDown() override { destroyLink(); }

    // Nobody reads the pseudo-terminal after this, so tests write nothing more.
    void destroyLink() { mOwned.destroy(); }
    // Destroys the link, which must wake its threads rather than wait out
    // a 2 s retry pause, and close the device.
    void destroyPromptly() {
        const auto before = Clock::now();
        destroyLink();
        EXPECT_LT(msSince(before), 1800);
        EXPECT_EQ(-1, link.mFd);
    }

    void startLink() {
        ASSERT_TRUE(mOwned.init());
        for (const char* entry : {kRxEntry, kTxEntry, kHdEntry}) {
            ASSERT_TRUE(log.waitFor(ANDROID_LOG_DEBUG, kTag, entry));
        }
    }

    // The next record from the link, read as a bind request: every one must
    // start with kWholeBind, then name its stream and local end.
    std::string readBind() {
        VPR_Comm record{};
        EXPECT_TRUE(pty.readRecord(&record)) << "no record from the link";
        const BindRequest b = readBindRequest(record);
        return "target " + std::to_string(b.targetModule) + ", type " + std::to_string(b.type) + ", length " +
               std::to_string(b.recordLength) + ", code " + std::to_string(b.code) + ": stream " +
               std::to_string(b.streamId) + " at " + endpointText(b.addr);
    }

    // Reads `n` replies, each a whole bind request; answers the streams they name.
    std::multiset<int32_t> readBinds(size_t n) {
        std::multiset<int32_t> ids;
        for (size_t i = 0; i < n; ++i) {
            const std::string b = readBind();
            if (b.rfind(kWholeBind + "stream ", 0) != 0) {
                ADD_FAILURE() << "reply " << i << " of " << n << ": " << b;
                break;
            }
            ids.insert(std::stoi(b.substr(kWholeBind.size() + 7)));
        }
        return ids;
    }
    static std::multiset<int32_t> range(int32_t first, int32_t last) {
        std::multiset<int32_t> ids;
        for (int32_t id = first; id <= last; ++id) ids.insert(id);
        return ids;
    }
    size_t recvLines() const {
        size_t n = 0;
        for (const LogLine& l : log.linesWithTag(kTag)) n += l.text.rfind("cmdRxFunc, recv msg ", 0) == 0;
        return n;
    }

    // Starts the link with the media engine not answering: the handling
    // thread takes a first start and waits in the engine, so every later
    // command stays queued.
    void startLinkWithHandlingHeld() {
        hostfakes::holdCalls("Mvd_Open");
        startLink();
        pty.writeRecord(streamRecord(startCommand(1)));
        ASSERT_TRUE(eventually([&] { return log.contains(ANDROID_LOG_DEBUG, kTag, recvLine(1, 0)) &&
                                            link.mRxQueue.size() == 0; }));
    }

    // The link's own lines apart from the three thread entries, in order.
    V linkLines() const {
        V out;
        for (const LogLine& l : log.linesWithTag(kTag)) {
            if (l.text != kRxEntry && l.text != kTxEntry && l.text != kHdEntry) out.push_back(l.text);
        }
        return out;
    }

    LogCapture log;
    ModemPty pty;
    ScopedLink mOwned{pty.devicePath()};
    VtspManager& link = mOwned.link;
};

}  // namespace

TEST_F(VtspManagerTest, RecordsForOtherModulesAreDroppedAndAWholeCallGoesThrough) {
    startLink();
    // Each of these carries a valid start: any of them reaching the handler
    // would open a media engine stream and send a bind request.
    const StreamCommand other = startCommand(9, "10.0.0.9", 6010);
    pty.writeRecord(streamRecord(other, 0, VPMD_VPAD_TARGET));
    pty.writeRecord(streamRecord(other, 0, VPMD_NET_TARGET));
    pty.writeRecord(streamRecord(other, 0, 5));
    pty.writeRecord(streamRecord(other, 3, VPMD_VIDEO_CMDEVT_TARGET));
    // The start arrives one byte a write and is still routed once.
    StreamCommand start = startCommand(7);
    pty.writeRecord(streamRecord(start), 1);
    // The queue keeps order, so this bind request proves that none of the
    // first four was queued before it. It goes out in wire order (read back
    // here in host order); how a body is turned and composed is
    // CmdBufferTest's business.
    EXPECT_EQ(bindOf(7), readBind());
    EXPECT_EQ((V{recvLine(1, 8), "cmdRxFunc, recv VPMD_VPAD_TARGET, modem is active", recvLine(2, 1),
                 recvLine(3, 5), recvLine(4, 0), "cmdRxFunc, msg 4, VPMD_VIDEO_CMDEVT_TARGET, type 3",
                 recvLine(5, 0), kWritten}),
              linkLines());
    for (const LogLine& l : log.linesWithTag(kTag)) EXPECT_EQ(ANDROID_LOG_DEBUG, l.priority) << l.text;
    EXPECT_TRUE(called("Mvd_ProcStart(1) = 0"));

    // Each later kind of command reaches the stream: RTCP feedback, a hold, the end.
    ConfigCommand config;
    config.data[1] = 7;
    config.data[2] = 0x30;
    pty.writeRecord(configRecord(config));
    EXPECT_TRUE(called("Mvd_TptEnableNack(1, 1) = 0"));
    start.code = _VTSP_CMD_STREAM_VIDEO_MODITY;
    start.dir = _VTSP_STREAM_DIR_INACTIVE;
    pty.writeRecord(streamRecord(start));
    EXPECT_TRUE(called("Mvd_ProcStop(1) = 0"));
    start.code = _VTSP_CMD_STREAM_VIDEO_END;
    pty.writeRecord(streamRecord(start));
    EXPECT_TRUE(called("Mvd_Close(1) = 0"));
    EXPECT_TRUE(pty.silentFor(100ms));  // only the start had a reply
    EXPECT_EQ(1u, hostfakes::callCount("Mvd_Open"));
}

TEST_F(VtspManagerTest, DestroyEndsBlockedThreadsAndTheLinkComesBackOnce) {
    startLink();
    // Named threads, each sleeping: the receiver in read, the others in their queues.
    ASSERT_TRUE(eventually([] { return linkThreads(1, 'S'); }));
    ASSERT_EQ(2u, openDescriptorsOn(pty.devicePath()));  // ours and the link's
    destroyPromptly();
    EXPECT_EQ(1u, log.count(ANDROID_LOG_INFO, kTag, "cmdHandleFunc: cmdHandleFunc: Rx queue is stop"));
    EXPECT_EQ(1u, log.count(ANDROID_LOG_INFO, kTag, "cmdTxFunc: cmdTxFunc: Tx queue is stop"));
    EXPECT_EQ(1u, openDescriptorsOn(pty.devicePath()));
    EXPECT_TRUE(eventually([] { return linkThreads(0); }));

    // The link can be brought up again: device reopened, a fresh set of
    // threads. A second init neither reopens nor starts more threads.
    log.clear();
    startLink();
    const int fd = link.mFd;
    ASSERT_NE(-1, fd);
    EXPECT_TRUE(link.init());
    EXPECT_EQ(fd, link.mFd);
    EXPECT_EQ(2u, openDescriptorsOn(pty.devicePath()));
    // A round trip gives any extra thread time to announce itself.
    pty.writeRecord(streamRecord(startCommand(7)));
    EXPECT_EQ(bindOf(7), readBind());
    EXPECT_TRUE(linkThreads(1));

    // A closed modem end is logged (the kernel reports the hang-up as an
    // error or as end of file) and does not hold up destroy.
    pty.closeMaster();
    ASSERT_TRUE(eventually([&] {
        for (const LogLine& l : log.linesWithTag(kTag)) {
            if (l.priority == ANDROID_LOG_ERROR && l.text.rfind(kReadFailed, 0) == 0) return true;
        }
        return false;
    }));
    destroyPromptly();
    EXPECT_TRUE(eventually([] { return linkThreads(0); }));
}

// The modem stops reading: replies fill the pipe until one is taken only in
// part, and the link is destroyed while the transmit thread waits for room.
// The modem must never see a record cut short, also after a restart.
TEST_F(VtspManagerTest, ReplyCutShortByDestroyIsFinishedFirstWhenTheLinkRunsAgain) {
    startLink();
    constexpr int kStarts = 40;  // more replies than the pseudo-terminal holds
    for (int id = 1; id <= kStarts; ++id) pty.writeRecord(streamRecord(startCommand(id)));
    ASSERT_TRUE(eventually([] { return hostfakes::callCount("Mvd_Open") == kStarts; }));
    // Every reply handed over and some still queued, so a sleeping transmit
    // thread is blocked in its write (the one it began is in `written`); the
    // same count twice in a row shows it stays there.
    size_t written = 0;
    ASSERT_TRUE(eventually([&] {
        const size_t before = log.count(ANDROID_LOG_DEBUG, kTag, kWritten);
        std::this_thread::sleep_for(50ms);
        const size_t now = log.count(ANDROID_LOG_DEBUG, kTag, kWritten), queued = link.mTxQueue.size();
        written = now;
        return now == before && queued > 0 && now + queued == kStarts && threadsNamed("tVtspCmdTx", 'S') == 1;
    }));
    destroyLink();
    const std::string cut = "writeToVpr: " + std::string(pty.devicePath()) + " took ";
    const auto lines = log.linesWithTag(kTag);
    const bool cutShort =
            std::any_of(lines.begin(), lines.end(), [&](const LogLine& l) { return l.text.rfind(cut, 0) == 0; });

    startLink();
    pty.writeRecord(streamRecord(startCommand(kStarts + 1)));
    // Whole records only, in order: every reply written before; the one being
    // written when the link stopped is completed now if it was cut, may have
    // gone out whole while the link stopped, or is dropped if it had not
    // begun (a pipe that filled exactly at a record's end); then the new one.
    V seen;
    while (seen.size() <= written && (seen.empty() || seen.back() != bindOf(kStarts + 1))) seen.push_back(readBind());
    ASSERT_EQ(bindOf(kStarts + 1), seen.back());
    const size_t before = seen.size() - 1;
    EXPECT_TRUE(before == written || (!cutShort && before + 1 == written)) << before << " of " << written;
    for (size_t id = 1; id <= before; ++id) EXPECT_EQ(bindOf(id), seen[id - 1]);
    EXPECT_EQ(cutShort, log.contains(ANDROID_LOG_INFO, kTag, "writeToVpr: rest of the unfinished record written to " +
                                                                     std::string(pty.devicePath())));
}

TEST_F(VtspManagerTest, DeletingARunningLinkEndsItsThreadsFirstAndANeverStartedOneWakesNone) {
    VtspManager closed(pty.devicePath());
    closed.destroy();
    EXPECT_EQ(-1, closed.mFd);
    EXPECT_TRUE(log.linesWithTag(kTag).empty());
    auto running = std::make_unique<VtspManager>(pty.devicePath());
    ASSERT_TRUE(running->init());
    ASSERT_TRUE(eventually([] { return linkThreads(1, 'S'); }));
    running.reset();
    EXPECT_TRUE(eventually([] { return linkThreads(0); }));
    EXPECT_EQ(1u, openDescriptorsOn(pty.devicePath()));
}

TEST_F(VtspManagerTest, FloodWaitsAtTheHighWaterMarkAndIsHandledInOrder) {
    startLinkWithHandlingHeld();
    constexpr uint32_t kFlood = 300;
    std::atomic<uint32_t> written{1};
    std::thread modem([&] {
        for (uint32_t id = 2; id <= kFlood; ++id, ++written) pty.writeRecord(streamRecord(startCommand(id)));
    });
    struct Finish {
        std::thread& modem;
        ~Finish() {
            hostfakes::releaseCalls();
            modem.join();
        }
    } finish{modem};

    const size_t high = VtspManager::kRxHighWater;
    ASSERT_TRUE(eventually([&] { return link.mRxQueue.size() == high; }));
    std::this_thread::sleep_for(200ms);  // time for a receiver that kept reading to show it
    EXPECT_EQ(high, link.mRxQueue.size());
    EXPECT_LT(written.load(), kFlood);  // the full pipe holds the modem's writes back

    hostfakes::releaseCalls();
    for (uint32_t id = 1; id <= kFlood; ++id) ASSERT_EQ(bindOf(id), readBind());
    EXPECT_EQ(high, link.mRxQueue.peakSize());
    EXPECT_EQ(kFlood, hostfakes::callCount("Mvd_Open"));
}

TEST_F(VtspManagerTest, StopAndDestroyEndAReceiverWaitingForRoom) {
    startLinkWithHandlingHeld();
    const size_t high = VtspManager::kRxHighWater;
    uint32_t id = 2;
    const auto write = [&](size_t n) {
        for (size_t i = 0; i < n; ++i) pty.writeRecord(streamRecord(startCommand(id++)));
    };
    write(high);
    ASSERT_TRUE(eventually([&] { return link.mRxQueue.size() == high; }));
    write(2);  // these stay in the pipe, which holds only a few records

    // Stopping empties the queue: the receiver reads again, refusing while stopped.
    link.stop();
    EXPECT_TRUE(log.waitFor(ANDROID_LOG_ERROR, kTag, kRefused, 2));
    link.start();
    write(high);
    ASSERT_TRUE(eventually([&] { return link.mRxQueue.size() == high; }));

    // The receiver ends while the engine still holds the handling thread,
    // which destroy then joins once the engine answers.
    auto destroyed = std::async(std::launch::async, [&] { destroyLink(); });
    EXPECT_TRUE(eventually([] { return threadsNamed("tVtspCmdRx") == 0; }));
    hostfakes::releaseCalls();
    EXPECT_EQ(std::future_status::ready, destroyed.wait_for(5s));
    EXPECT_EQ(-1, link.mFd);
}

TEST_F(VtspManagerTest, WakeUpSignalNeitherEndsTheProcessRightAfterInitNorIsLostToABlockedMask) {
    // The wake-up signal's default action ends the process, so destroy must
    // not be able to send it before the link has set up its handler. Earlier
    // links in this process may have installed one already: start from the default.
    struct sigaction saved {};
    sigaction(SIGUSR1, nullptr, &saved);
    struct Restore {
        const struct sigaction& s;
        ~Restore() { sigaction(SIGUSR1, &s, nullptr); }
    } restore{saved};
    for (int i = 0; i < 20; ++i) {
        signal(SIGUSR1, SIG_DFL);
        ASSERT_TRUE(mOwned.init());
        destroyLink();
        ASSERT_EQ(-1, link.mFd);
    }

    // Threads inherit the signal mask of the thread that starts them.
    WatchedThreads watch(10s);
    auto ended = watch.run([&] {
        sigset_t set;
        sigemptyset(&set);
        sigaddset(&set, SIGUSR1);
        pthread_sigmask(SIG_BLOCK, &set, nullptr);
        startLink();
        destroyLink();
    });
    EXPECT_TRUE(watch.finishes(ended));
    EXPECT_TRUE(eventually([] { return linkThreads(0); }));
}

// A device that cannot be opened, or that is at its end, is a failed read
// retried after a pause of two seconds, not a spin; destroy interrupts the pause.
TEST_F(VtspManagerTest, UnreadableDeviceIsRetriedEveryTwoSeconds) {
    char path[] = "/tmp/quellborn-modem-XXXXXX";
    const int fd = mkstemp(path);
    ASSERT_GE(fd, 0);
    close(fd);
    struct Unlink {
        const char* p;
        ~Unlink() { unlink(p); }
    } unlinkLater{path};

    const std::pair<const char*, const char*> cases[] = {{"/nonexistent/quellborn-modem", "Bad file descriptor"},
                                                         {path, "end of file"}};
    for (const auto& [device, error] : cases) {
        SCOPED_TRACE(device);
        ScopedLink broken(device);
        EXPECT_TRUE(broken.init());
        const std::string failed = kReadFailed + std::string(error);
        ASSERT_TRUE(log.waitFor(ANDROID_LOG_ERROR, kTag, failed, 2, 5s));
        EXPECT_GE(log.firstGap(ANDROID_LOG_ERROR, kTag, failed).count(), 1900);  // a pause, not a busy loop
        const auto before = Clock::now();
        broken.destroy();
        EXPECT_LT(msSince(before), 1800);  // woken, not waited for
        EXPECT_EQ(2u, log.count(ANDROID_LOG_ERROR, kTag, failed));
    }
}

TEST_F(VtspManagerTest, Sigusr1StormLosesAndRepeatsNothing) {
    startLink();
    const pthread_t targets[] = {link.mRxThread, link.mTxThread, link.mHandleThread};
    std::atomic<bool> storming{true};
    std::atomic<int> sent{0};
    std::thread storm([&] {
        while (storming) {
            for (pthread_t t : targets) pthread_kill(t, SIGUSR1);
            ++sent;
            std::this_thread::sleep_for(1ms);
        }
    });
    constexpr int kRecords = 30;
    const auto stormBegan = Clock::now();
    while (sent < 20 && msSince(stormBegan) < 5000) std::this_thread::sleep_for(1ms);
    // Short writes with pauses so the receiver is interrupted in the middle of records too.
    for (int id = 1; id <= kRecords; ++id) pty.writeRecord(streamRecord(startCommand(id)), 1000, 1ms);
    const std::multiset<int32_t> ids = readBinds(kRecords);
    storming = false;
    storm.join();
    EXPECT_GT(sent.load(), 50);
    EXPECT_EQ(range(1, kRecords), ids);
    EXPECT_TRUE(pty.silentFor(100ms));
    EXPECT_EQ(static_cast<size_t>(kRecords), recvLines());
}

// The link's descriptor is swapped for a read-only one on the same device:
// reads still work, every write fails.
TEST_F(VtspManagerTest, FailedWriteIsRetriedAfterAPauseAndResumes) {
    startLink();
    const int readOnly = open(pty.devicePath(), O_RDONLY | O_NOCTTY);
    const int readWrite = open(pty.devicePath(), O_RDWR | O_NOCTTY);
    ASSERT_GE(readOnly, 0);
    ASSERT_GE(readWrite, 0);
    ASSERT_EQ(link.mFd, dup2(readOnly, link.mFd));
    const std::string failed = "Failed to write data to " + std::string(pty.devicePath()) +
                               ", err: Bad file descriptor";

    pty.writeRecord(streamRecord(startCommand(5)));
    ASSERT_TRUE(log.waitFor(ANDROID_LOG_ERROR, kTag, failed, 2, 5s));
    EXPECT_GE(log.firstGap(ANDROID_LOG_ERROR, kTag, failed).count(), 1900);  // a pause, not a busy loop

    // The device works again: the pending reply goes out whole, once.
    ASSERT_EQ(link.mFd, dup2(readWrite, link.mFd));
    EXPECT_EQ(range(5, 5), readBinds(1));
    EXPECT_TRUE(pty.silentFor(100ms));
    EXPECT_EQ(1u, hostfakes::callCount("Mvd_Open"));

    // Failing again, destroy still returns promptly.
    ASSERT_EQ(link.mFd, dup2(readOnly, link.mFd));
    pty.writeRecord(streamRecord(startCommand(6)));
    ASSERT_TRUE(log.waitFor(ANDROID_LOG_ERROR, kTag, failed, 4, 8s));
    destroyPromptly();
    close(readOnly);
    close(readWrite);
}

TEST_F(VtspManagerTest, StopAndStartBetweenRecordsHandleOnlyAcceptedOnes) {
    startLink();
    constexpr int kPerPhase = 5;
    for (int i = 1; i <= kPerPhase; ++i) pty.writeRecord(streamRecord(startCommand(i)));
    EXPECT_EQ(range(1, kPerPhase), readBinds(kPerPhase));
    link.stop();
    for (int i = 51; i <= 50 + kPerPhase; ++i) pty.writeRecord(streamRecord(startCommand(i)));
    ASSERT_TRUE(log.waitFor(ANDROID_LOG_ERROR, kTag, kRefused, kPerPhase));
    link.start();
    pty.writeRecord(streamRecord(startCommand(100)));
    EXPECT_EQ(range(100, 100), readBinds(1));
    EXPECT_TRUE(pty.silentFor(100ms));
    EXPECT_EQ(size_t{kPerPhase}, log.count(ANDROID_LOG_ERROR, kTag, kRefused));
    EXPECT_EQ(size_t{2 * kPerPhase + 1}, recvLines());
    EXPECT_EQ(size_t{kPerPhase + 1}, hostfakes::callCount("Mvd_Open"));
    EXPECT_FALSE(link.mCmdCallback->snapshot(51));
}
