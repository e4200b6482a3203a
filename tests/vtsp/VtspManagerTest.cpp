// The modem command link run on a raw pseudo-terminal with its real threads:
// record assembly and routing, a whole call from the modem's side, pausing,
// shutdown in every state, an unusable device and garbage on the pipe.
#include <android/log.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/types.h>
#include <unistd.h>

#include <chrono>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include "HostFakes.h"
#include "LogCapture.h"
#include "ModemPty.h"
#include "VtspManager.h"
#include "VtspRecord.h"

using namespace android;
using namespace vtspcodec;
using namespace std::chrono_literals;
using Clock = std::chrono::steady_clock;

namespace {

const char* const kTag = "VTSPManager";
const char* const kRxEntry = "cmdRxFunc: cmdRxFunc E";
const char* const kTxEntry = "cmdTxFunc: cmdTxFunc: E";
const char* const kHdEntry = "cmdHandleFunc: cmdHandleFunc: E";
const char* const kRefused = "pushAndSignal: failed to push elem";
const char* const kRxStopped = "cmdHandleFunc: cmdHandleFunc: Rx queue is stop";
const char* const kTxStopped = "cmdTxFunc: cmdTxFunc: Tx queue is stop";
const char* const kReadFailed = "readFromVpr: cmdRxFunc: failed to read file, error ";
const char* const kFrontCamera = "\"Camera 1, Facing front, Orientation 270\"";

struct Task {
    std::string name;
    char state;
};

std::vector<Task> tasks() {
    std::vector<Task> out;
    for (const auto& entry : std::filesystem::directory_iterator("/proc/self/task")) {
        std::ifstream commFile(entry.path() / "comm");
        std::ifstream statFile(entry.path() / "stat");
        Task t{"", '?'};
        std::getline(commFile, t.name);
        std::string stat((std::istreambuf_iterator<char>(statFile)), std::istreambuf_iterator<char>());
        const size_t paren = stat.rfind(')');
        if (paren != std::string::npos && paren + 2 < stat.size()) t.state = stat[paren + 2];
        out.push_back(t);
    }
    return out;
}

size_t tasksNamed(const std::string& name, bool sleepingOnly = false) {
    size_t n = 0;
    for (const Task& t : tasks()) {
        if (t.name == name && (!sleepingOnly || t.state == 'S')) ++n;
    }
    return n;
}

const char* const kThreadNames[] = {"tVtspCmdRx", "tVtspCmdHd", "tVtspCmdTx"};

// True when each of the link's three threads exists exactly `count` times.
bool linkThreads(size_t count, bool sleepingOnly = false) {
    for (const char* name : kThreadNames) {
        if (tasksNamed(name, sleepingOnly) != count) return false;
    }
    return true;
}

long long msSince(Clock::time_point t) {
    return std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - t).count();
}

template <typename Pred>
bool eventually(Pred pred, std::chrono::milliseconds timeout = 5s) {
    const auto deadline = Clock::now() + timeout;
    while (!pred()) {
        if (Clock::now() >= deadline) return false;
        std::this_thread::sleep_for(2ms);
    }
    return true;
}

// Descriptors of this process that are open on `path`.
size_t openDescriptorsOn(const std::string& path) {
    size_t n = 0;
    for (const auto& entry : std::filesystem::directory_iterator("/proc/self/fd")) {
        std::error_code ec;
        if (std::filesystem::read_symlink(entry.path(), ec) == path) ++n;
    }
    return n;
}

StreamCommand startCommand(uint32_t streamId) {
    StreamCommand c;
    c.code = _VTSP_CMD_STREAM_VIDEO_START;
    c.streamId = streamId;
    c.dir = VTSP_STREAM_DIR_SENDRECV;
    c.encodeType[0] = 96;
    c.localAddr = address("10.0.0.1", 6000);
    c.remoteAddr = address("192.168.1.2", 5000);
    c.localVideoAsBwKbps = 500;
    return c;
}

std::string recvLine(int msg, int target) {
    return "cmdRxFunc, recv msg " + std::to_string(msg) + ", targetModule " + std::to_string(target);
}

// Destroys its link exactly once, also when a test stops half-way.
class ScopedLink {
public:
    explicit ScopedLink(const char* path) : link(path) {}
    ~ScopedLink() { destroy(); }
    ScopedLink(const ScopedLink&) = delete;
    ScopedLink& operator=(const ScopedLink&) = delete;
    bool init() {
        mRunning = true;
        return link.init();
    }
    void destroy() {
        if (!mRunning) return;
        mRunning = false;
        link.destroy();
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

    void startLink() {
        ASSERT_TRUE(mOwned.init());
        ASSERT_TRUE(log.waitFor(ANDROID_LOG_DEBUG, kTag, kRxEntry));
        ASSERT_TRUE(log.waitFor(ANDROID_LOG_DEBUG, kTag, kTxEntry));
        ASSERT_TRUE(log.waitFor(ANDROID_LOG_DEBUG, kTag, kHdEntry));
    }

    // Waits until `n` more media engine calls than `from` are recorded and
    // returns those since `from`.
    std::vector<std::string> callsSince(size_t from, size_t n) {
        EXPECT_TRUE(eventually([&] { return hostfakes::callCount() >= from + n; }))
                << "only " << hostfakes::callCount() - from << " of " << n << " calls";
        return hostfakes::callTextsSince(from);
    }

    BindRequest readBind(VPR_Comm* raw = nullptr) {
        VPR_Comm record{};
        EXPECT_TRUE(pty.readRecord(&record)) << "no record from the link";
        if (raw != nullptr) *raw = record;
        return readBindRequest(record);
    }

    // The link's own lines apart from the three thread entries, in order.
    std::vector<std::string> linkLines() const {
        std::vector<std::string> out;
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

TEST_F(VtspManagerTest, RecordArrivingInShortWritesIsRoutedOnce) {
    startLink();
    pty.writeRecord(streamRecord(startCommand(7)), 100, 1ms);
    const BindRequest bind = readBind();
    EXPECT_EQ(7, bind.streamId);
    EXPECT_EQ("10.0.0.1", addressText(bind.addr));
    EXPECT_EQ(6000, bind.addr.port);
    EXPECT_EQ((std::vector<std::string>{recvLine(1, 0), "cmdTxFunc, write Data to VPR"}), linkLines());
    size_t opens = 0;
    for (const std::string& name : hostfakes::callNames()) opens += name == "Mvd_Open";
    EXPECT_EQ(1u, opens);
}

TEST_F(VtspManagerTest, RoutesByTargetModuleAndRecordType) {
    startLink();
    // Each of these carries a valid start: any of them reaching the handler
    // would open a media engine stream and send a bind request.
    const StreamCommand start = startCommand(7);
    pty.writeRecord(streamRecord(start, 0, VPMD_VPAD_TARGET));
    pty.writeRecord(streamRecord(start, 0, VPMD_NET_TARGET));
    pty.writeRecord(streamRecord(start, 0, 5));
    pty.writeRecord(streamRecord(start, 3, VPMD_VIDEO_CMDEVT_TARGET));
    StreamCommand accepted = startCommand(9);
    accepted.localAddr = address("10.0.0.9", 6010);
    pty.writeRecord(streamRecord(accepted));

    // The queue keeps order, so the bind request of the fifth record proves
    // that none of the first four was queued before it.
    const BindRequest bind = readBind();
    EXPECT_EQ(9, bind.streamId);
    EXPECT_EQ((std::vector<std::string>{recvLine(1, 8), "cmdRxFunc, recv VPMD_VPAD_TARGET, modem is active",
                                        recvLine(2, 1), recvLine(3, 5), recvLine(4, 0),
                                        "cmdRxFunc, msg 4, VPMD_VIDEO_CMDEVT_TARGET, type 3",
                                        recvLine(5, 0), "cmdTxFunc, write Data to VPR"}),
              linkLines());
    for (const LogLine& l : log.linesWithTag(kTag)) EXPECT_EQ(ANDROID_LOG_DEBUG, l.priority) << l.text;
    const std::vector<std::string> calls = hostfakes::callTexts();
    ASSERT_FALSE(calls.empty());
    EXPECT_EQ("Mvd_Open(\"10.0.0.9\", 6010, out=1) = 0", calls[0]);
    for (size_t i = 1; i < calls.size(); ++i) EXPECT_NE(0u, calls[i].rfind("Mvd_Open", 0)) << calls[i];
}

TEST_F(VtspManagerTest, WholeCallFromTheModemsSide) {
    startLink();
    const StreamCommand start = startCommand(7);
    pty.writeRecord(streamRecord(start));
    VPR_Comm raw{};
    const BindRequest bind = readBind(&raw);
    EXPECT_EQ(VPMD_NET_TARGET, bind.targetModule);
    EXPECT_EQ(0u, bind.type);
    EXPECT_EQ(3664u, bind.recordLength);
    EXPECT_EQ(VPR_NET_CMD_BIND, bind.code);
    EXPECT_EQ(7, bind.streamId);
    EXPECT_EQ("10.0.0.1", addressText(bind.addr));
    EXPECT_EQ(6000, bind.addr.port);
    // On the wire: code 7, stream 7, octets 10.0.0.1, port 6000 big-endian,
    // address type 0, zeros to the trailer, then type 0, target 1, length 3664.
    const unsigned char* b = reinterpret_cast<const unsigned char*>(&raw);
    const unsigned char head[] = {7, 0, 0, 0, 7, 0, 0, 0, 10, 0, 0, 1};
    EXPECT_EQ(0, memcmp(head, b, sizeof(head)));
    EXPECT_EQ(0x17, b[28]);
    EXPECT_EQ(0x70, b[29]);
    size_t nonZero = 0;
    for (size_t i = 12; i < kVprCommBodySize; ++i) nonZero += b[i] != 0;
    EXPECT_EQ(2u, nonZero);  // only the two port bytes
    const unsigned char trailer[] = {0, 0, 0, 0, 1, 0, 0, 0, 0x50, 0x0e, 0, 0};
    EXPECT_EQ(0, memcmp(trailer, b + kVprCommBodySize, sizeof(trailer)));

    const std::vector<std::string> started = {
            "Mvd_Open(\"10.0.0.1\", 6000, out=1) = 0",
            "Mvd_TptSetSend(1, 1) = 0",
            "Mvd_TptSetRecv(1, 1) = 0",
            "Mvd_SetRmtAddr(1, \"192.168.1.2\", 5000) = 0",
            "Mvd_SetUniqueName(1, \"Remote\") = 0",
            "Mvd_GetCdc(1, \"H264\", {pt=0 br=0 fps=0 0x0}) = 0",
            "Mvd_ArsSetEnable(1, 1) = 0",
            "Mvd_ArsSetParm(1, 100000, 512000, 20, 30) = 0",
            "Mvd_SetCdc(1, {pt=96 br=600000 fps=30 480x640}) = 0",
            "Mvd_SetSendPayload(1, 96) = 0",
            "Mvd_RedSetEnable(1, 0) = 0",
            "Mvd_ProcStart(1) = 0",
            std::string("Mvd_CaptureAttach(1, ") + kFrontCamera + ") = 0",
    };
    EXPECT_EQ(started, hostfakes::callTexts());
    const std::string unchangedCodec = "Mvd_GetCdc(1, \"H264\", {pt=96 br=600000 fps=30 480x640}) = 0";

    // RTCP feedback: NACK only (0x30 keeps just 0x10). The running streams
    // are suspended for the change and resumed before the command ends.
    ConfigCommand config;
    config.data[0] = 1;
    config.data[1] = 7;
    config.data[2] = 0x30;
    size_t mark = hostfakes::callCount();
    pty.writeRecord(configRecord(config));
    EXPECT_EQ((std::vector<std::string>{"Mvd_RedSetEnable(1, 0) = 0", "Mvd_SuspendAllStrm() = 0",
                                        "Mvd_TptEnableTmmbr(1, 0) = 0", "Mvd_TptEnableNack(1, 1) = 0",
                                        "Mvd_TptEnableFir(1, 0) = 0", "Mvd_ResumeAllStrm() = 0"}),
              callsSince(mark, 6));

    StreamCommand modify = start;
    modify.code = _VTSP_CMD_STREAM_VIDEO_MODITY;
    modify.dir = _VTSP_STREAM_DIR_INACTIVE;
    mark = hostfakes::callCount();
    pty.writeRecord(streamRecord(modify));
    EXPECT_EQ((std::vector<std::string>{"Mvd_ProcStop(1) = 0", "Mvd_SetUniqueName(1, \"Remote\") = 0",
                                        unchangedCodec, "Mvd_RedSetEnable(1, 0) = 0"}),
              callsSince(mark, 4));

    modify.dir = VTSP_STREAM_DIR_SENDRECV;
    mark = hostfakes::callCount();
    pty.writeRecord(streamRecord(modify));
    EXPECT_EQ((std::vector<std::string>{"Mvd_TptSetSend(1, 1) = 0", "Mvd_TptSetRecv(1, 1) = 0",
                                        "Mvd_SetUniqueName(1, \"Remote\") = 0", unchangedCodec,
                                        "Mvd_RedSetEnable(1, 0) = 0", "Mvd_ProcStart(1) = 0",
                                        std::string("Mvd_CaptureAttach(1, ") + kFrontCamera + ") = 0"}),
              callsSince(mark, 7));

    // A new remote port keeps the known remote address and resumes the
    // streams within the same command.
    modify.remoteAddr = address("192.168.1.2", 5002);
    mark = hostfakes::callCount();
    pty.writeRecord(streamRecord(modify));
    EXPECT_EQ((std::vector<std::string>{"Mvd_SetRmtAddr(1, \"192.168.1.2\", 5002) = 0",
                                        "Mvd_SetUniqueName(1, \"Remote\") = 0", unchangedCodec,
                                        "Mvd_RedSetEnable(1, 0) = 0", "Mvd_ResumeAllStrm() = 0"}),
              callsSince(mark, 5));

    StreamCommand end = modify;
    end.code = _VTSP_CMD_STREAM_VIDEO_END;
    mark = hostfakes::callCount();
    pty.writeRecord(streamRecord(end));
    EXPECT_EQ((std::vector<std::string>{"Mvd_CaptureDetach(1) = 0", "Mvd_ProcStop(1) = 0",
                                        "Mvd_Close(1) = 0"}),
              callsSince(mark, 3));
    EXPECT_EQ(0u, link.mCmdCallback->streamCount());
    EXPECT_TRUE(hostfakes::openMvdStreams().empty());
    // Only the start had a reply.
    EXPECT_TRUE(pty.silentFor(100ms));
    EXPECT_EQ(1u, log.count(ANDROID_LOG_DEBUG, kTag, "cmdTxFunc, write Data to VPR"));
    EXPECT_TRUE(log.contains(ANDROID_LOG_DEBUG, kTag, recvLine(6, 0)));
}

TEST_F(VtspManagerTest, StoppedLinkDropsCommandsUntilStartedAgain) {
    startLink();
    link.stop();
    pty.writeRecord(streamRecord(startCommand(7)));
    ASSERT_TRUE(log.waitFor(ANDROID_LOG_ERROR, kTag, kRefused));
    EXPECT_TRUE(log.contains(ANDROID_LOG_DEBUG, kTag, recvLine(1, 0)));

    link.start();
    StreamCommand next = startCommand(8);
    next.localAddr = address("10.0.0.8", 6008);
    pty.writeRecord(streamRecord(next));
    const BindRequest bind = readBind();
    EXPECT_EQ(8, bind.streamId);
    // The refused command never reached the media engine, before or after.
    const std::vector<std::string> calls = hostfakes::callTexts();
    ASSERT_FALSE(calls.empty());
    EXPECT_EQ("Mvd_Open(\"10.0.0.8\", 6008, out=1) = 0", calls[0]);
    EXPECT_EQ(1u, log.count(ANDROID_LOG_ERROR, kTag, kRefused));
    EXPECT_EQ(1u, link.mCmdCallback->streamCount());
}

TEST_F(VtspManagerTest, DestroyEndsThreadsBlockedInTheDeviceAndOnEmptyQueues) {
    startLink();
    // Named threads, each sleeping: the receiver in read, the others in their queues.
    ASSERT_TRUE(eventually([] { return linkThreads(1, true); }));
    ASSERT_EQ(2u, openDescriptorsOn(pty.devicePath()));  // ours and the link's

    const auto before = Clock::now();
    destroyLink();
    EXPECT_LT(msSince(before), 1000);
    EXPECT_EQ(1u, log.count(ANDROID_LOG_INFO, kTag, kRxStopped));
    EXPECT_EQ(1u, log.count(ANDROID_LOG_INFO, kTag, kTxStopped));
    EXPECT_EQ(-1, link.mFd);
    EXPECT_EQ(1u, openDescriptorsOn(pty.devicePath()));
    EXPECT_TRUE(eventually([] { return linkThreads(0); }));

    // The link can be brought up again: device reopened, a fresh set of threads.
    log.clear();
    startLink();
    EXPECT_NE(-1, link.mFd);
    pty.writeRecord(streamRecord(startCommand(7)));
    EXPECT_EQ(7, readBind().streamId);
    EXPECT_TRUE(log.contains(ANDROID_LOG_DEBUG, kTag, recvLine(1, 0)));
    EXPECT_TRUE(linkThreads(1));
}

TEST_F(VtspManagerTest, DestroyRightAfterInitDoesNotEndTheProcess) {
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
}

TEST_F(VtspManagerTest, DestroyWithoutThreadsOnlyClosesAnOpenDevice) {
    const int fd = open(pty.devicePath(), O_RDWR | O_NOCTTY);
    ASSERT_GE(fd, 0);
    link.mFd = fd;
    const auto before = Clock::now();
    link.destroy();
    EXPECT_LT(msSince(before), 500);
    EXPECT_EQ(-1, link.mFd);
    EXPECT_EQ(-1, fcntl(fd, F_GETFD));
    EXPECT_EQ(EBADF, errno);

    VtspManager closed(pty.devicePath());
    closed.destroy();
    EXPECT_EQ(-1, closed.mFd);
    EXPECT_TRUE(log.linesWithTag(kTag).empty());  // no thread ran, none was woken
}

TEST_F(VtspManagerTest, SecondInitNeitherReopensNorStartsMoreThreads) {
    startLink();
    const int fd = link.mFd;
    ASSERT_NE(-1, fd);
    const size_t threads = tasks().size();
    EXPECT_TRUE(link.init());
    EXPECT_EQ(fd, link.mFd);
    EXPECT_EQ(threads, tasks().size());
    EXPECT_EQ(2u, openDescriptorsOn(pty.devicePath()));

    // A round trip gives any extra thread time to announce itself.
    pty.writeRecord(streamRecord(startCommand(7)));
    EXPECT_EQ(7, readBind().streamId);
    for (const char* entry : {kRxEntry, kTxEntry, kHdEntry}) {
        EXPECT_EQ(1u, log.count(ANDROID_LOG_DEBUG, kTag, entry)) << entry;
    }
    EXPECT_TRUE(linkThreads(1));
}

TEST_F(VtspManagerTest, UnopenableDeviceIsRetriedEveryTwoSeconds) {
    ScopedLink broken("/nonexistent/quellborn-modem");
    EXPECT_TRUE(broken.init());
    EXPECT_EQ(-1, broken.link.mFd);
    const std::string failed = std::string(kReadFailed) + "Bad file descriptor";
    ASSERT_TRUE(log.waitFor(ANDROID_LOG_ERROR, kTag, failed, 1, 2s));
    const auto first = Clock::now();
    ASSERT_TRUE(log.waitFor(ANDROID_LOG_ERROR, kTag, failed, 2, 3s));
    EXPECT_GT(msSince(first), 1500);  // a pause, not a busy loop
    EXPECT_EQ(2u, log.count(ANDROID_LOG_ERROR, kTag, failed));
    // Destroy interrupts the pause instead of waiting it out.
    const auto before = Clock::now();
    broken.destroy();
    EXPECT_LT(msSince(before), 1000);
    EXPECT_EQ(2u, log.count(ANDROID_LOG_ERROR, kTag, failed));
}

TEST_F(VtspManagerTest, EndOfFileIsAFailedReadNotASpin) {
    char path[] = "/tmp/quellborn-modem-XXXXXX";
    const int fd = mkstemp(path);
    ASSERT_GE(fd, 0);
    close(fd);
    struct Unlink {
        const char* p;
        ~Unlink() { unlink(p); }
    } unlinkLater{path};

    ScopedLink empty(path);
    EXPECT_TRUE(empty.init());
    const std::string eof = std::string(kReadFailed) + "end of file";
    ASSERT_TRUE(log.waitFor(ANDROID_LOG_ERROR, kTag, eof));
    const auto before = Clock::now();
    empty.destroy();
    EXPECT_LT(msSince(before), 1000);
    EXPECT_EQ(1u, log.count(ANDROID_LOG_ERROR, kTag, eof));
}

TEST_F(VtspManagerTest, ClosedModemEndIsLoggedAndDoesNotHoldUpDestroy) {
    startLink();
    pty.closeMaster();
    // The kernel reports the hang-up as an error or as end of file.
    ASSERT_TRUE(eventually([&] {
        for (const LogLine& l : log.linesWithTag(kTag)) {
            if (l.priority == ANDROID_LOG_ERROR && l.text.rfind(kReadFailed, 0) == 0) return true;
        }
        return false;
    }));
    const auto before = Clock::now();
    destroyLink();
    EXPECT_LT(msSince(before), 1000);
    EXPECT_EQ(-1, link.mFd);
    EXPECT_TRUE(eventually([] { return linkThreads(0); }));
}

TEST_F(VtspManagerTest, GarbageRecordsDoNotDerailTheLink) {
    startLink();
    std::mt19937 random(20240611u);
    constexpr int kGarbage = 20;
    for (int i = 0; i < kGarbage; ++i) {
        VPR_Comm record;
        unsigned char* bytes = reinterpret_cast<unsigned char*>(&record);
        for (size_t k = 0; k < sizeof(record); ++k) bytes[k] = static_cast<unsigned char>(random());
        // Steer most records into the stream commands so the dispatcher and
        // the streams see the random bodies too.
        const int32_t codes[] = {_VTSP_CMD_STREAM_VIDEO_START, _VTSP_CMD_STREAM_VIDEO_MODITY,
                                 _VTSP_CMD_CONFIG, _VTSP_CMD_STREAM_VIDEO_END};
        VtspCommand* body = reinterpret_cast<VtspCommand*>(record.body);
        if (i % 5 != 4) body->code = codes[i % 4];
        if (i % 2 == 0) {
            body->u.stmVideo.localAddr.type = static_cast<uint32_t>(i % 4);
            body->u.stmVideo.dir = static_cast<uint32_t>(i % 5);
            body->u.stmVideo.encoder = 0;
        }
        record.type = 0;
        record.targetModule = VPMD_VIDEO_CMDEVT_TARGET;
        pty.writeRecord(record);
    }
    ASSERT_TRUE(log.waitFor(ANDROID_LOG_DEBUG, kTag, recvLine(kGarbage, 0)));

    pty.writeRecord(streamRecord(startCommand(4242)));
    // Garbage starts may have been answered first; every answer is a whole bind request.
    BindRequest bind;
    for (int n = 0; n <= kGarbage; ++n) {
        bind = readBind();
        ASSERT_EQ(VPMD_NET_TARGET, bind.targetModule);
        ASSERT_EQ(3664u, bind.recordLength);
        ASSERT_EQ(VPR_NET_CMD_BIND, bind.code);
        if (bind.streamId == 4242) break;
    }
    EXPECT_EQ(4242, bind.streamId);
    EXPECT_EQ("10.0.0.1", addressText(bind.addr));
    EXPECT_EQ(6000, bind.addr.port);
    EXPECT_NE(nullptr, link.mCmdCallback->stream(4242));
}
