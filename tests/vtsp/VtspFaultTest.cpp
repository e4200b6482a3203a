// Faults on the modem command link's real descriptors: a record arriving one
// byte at a time, SIGUSR1 storms on the link's threads, a device that refuses
// reads or writes for a while, stop and start between records, and destroy while records flow.
// Every record accepted while the link runs must be handled exactly once and
// every reply must be written whole.
#include <android/log.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <pthread.h>
#include <signal.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "Eventually.h"
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
const char* const kRefused = "pushAndSignal: failed to push elem";
const char* const kRecvPrefix = "cmdRxFunc, recv msg ";

StreamCommand startCommand(uint32_t streamId) {
    StreamCommand c;
    c.streamId = streamId;
    c.localAddr = address("10.0.0.1", static_cast<uint16_t>(6000 + 2 * streamId));
    c.remoteAddr = address("192.168.1.2", 5000);
    return c;
}

class VtspFaultTest : public ::testing::Test {
protected:
    void SetUp() override { hostfakes::reset(); }
    void TearDown() override { destroyLink(); }

    void startLink() {
        mRunning = true;
        ASSERT_TRUE(link.init());
        for (const char* entry : {"cmdRxFunc: cmdRxFunc E", "cmdTxFunc: cmdTxFunc: E",
                                  "cmdHandleFunc: cmdHandleFunc: E"}) {
            ASSERT_TRUE(log.waitFor(ANDROID_LOG_DEBUG, kTag, entry));
        }
    }
    void destroyLink() {
        if (mRunning) link.destroy();
        mRunning = false;
    }

    size_t recvLines() const {
        size_t n = 0;
        for (const LogLine& l : log.linesWithTag(kTag)) n += l.text.rfind(kRecvPrefix, 0) == 0;
        return n;
    }

    // Reads `n` replies; each must be a whole bind request for the video
    // module. Answers the stream ids they name.
    std::multiset<int32_t> readBinds(size_t n) {
        std::multiset<int32_t> ids;
        for (size_t i = 0; i < n; ++i) {
            VPR_Comm record{};
            if (!pty.readRecord(&record)) {
                ADD_FAILURE() << "reply " << i << " of " << n << " never came";
                break;
            }
            const BindRequest b = readBindRequest(record);
            EXPECT_EQ(1u, b.targetModule);
            EXPECT_EQ(0u, b.type);
            EXPECT_EQ(kVprCommSize, b.recordLength);
            ids.insert(b.streamId);
        }
        return ids;
    }

    static std::multiset<int32_t> range(int32_t first, int32_t last) {
        std::multiset<int32_t> ids;
        for (int32_t id = first; id <= last; ++id) ids.insert(id);
        return ids;
    }

    LogCapture log;
    ModemPty pty;
    VtspManager link{pty.devicePath()};
    bool mRunning = false;
};

}  // namespace

TEST_F(VtspFaultTest, RecordArrivingOneByteAtATimeIsHandledOnce) {
    startLink();
    pty.writeRecord(streamRecord(startCommand(7)), 1);  // 3664 writes of one byte
    EXPECT_EQ(range(7, 7), readBinds(1));
    EXPECT_TRUE(pty.silentFor(100ms));
    EXPECT_EQ(1u, recvLines());
    EXPECT_EQ(1u, hostfakes::callCount("Mvd_Open"));
    EXPECT_TRUE(link.mCmdCallback->snapshot(7));
}

TEST_F(VtspFaultTest, Sigusr1StormLosesAndRepeatsNothing) {
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
    EXPECT_EQ(static_cast<size_t>(kRecords), hostfakes::callCount("Mvd_Open"));
    EXPECT_EQ(static_cast<size_t>(kRecords), link.mCmdCallback->streamCount());
}

// The link's descriptor is swapped for a read-only one on the same device:
// reads still work, every write fails.
TEST_F(VtspFaultTest, FailedWriteIsRetriedAfterAPauseAndResumes) {
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
    const auto before = Clock::now();
    destroyLink();
    EXPECT_LT(msSince(before), 1800);  // shorter than the 2 s retry pause
    EXPECT_EQ(-1, link.mFd);
    close(readOnly);
    close(readWrite);
}

TEST_F(VtspFaultTest, FailedReadIsRetriedAfterAPauseAndResumes) {
    startLink();
    const int writeOnly = open(pty.devicePath(), O_WRONLY | O_NOCTTY);
    const int readWrite = open(pty.devicePath(), O_RDWR | O_NOCTTY);
    ASSERT_GE(writeOnly, 0);
    ASSERT_GE(readWrite, 0);
    pty.writeRecord(streamRecord(startCommand(10)));
    EXPECT_EQ(range(10, 10), readBinds(1));
    ASSERT_EQ(link.mFd, dup2(writeOnly, link.mFd));
    const std::string failed = "readFromVpr: cmdRxFunc: failed to read file, error Bad file descriptor";

    // The receive thread may already sit in a read that keeps the old
    // descriptor, which record 11 then completes; either way the reads after
    // that fail, and record 11 is read once, before or after the repair.
    pty.writeRecord(streamRecord(startCommand(11)));
    ASSERT_TRUE(log.waitFor(ANDROID_LOG_ERROR, kTag, failed, 2, 5s));
    EXPECT_GE(log.firstGap(ANDROID_LOG_ERROR, kTag, failed).count(), 1900);  // a pause, not a busy loop

    // The device works again: the next record is read whole and handled once.
    ASSERT_EQ(link.mFd, dup2(readWrite, link.mFd));
    pty.writeRecord(streamRecord(startCommand(12)));
    EXPECT_EQ(range(11, 12), readBinds(2));
    EXPECT_TRUE(pty.silentFor(100ms));
    EXPECT_EQ(3u, hostfakes::callCount("Mvd_Open"));
    EXPECT_EQ(3u, recvLines());
    close(writeOnly);
    close(readWrite);
}

TEST_F(VtspFaultTest, StopAndStartBetweenRecordsHandleOnlyAcceptedOnes) {
    startLink();
    constexpr int kPerPhase = 5;
    size_t refused = 0;
    for (int cycle = 0; cycle < 3; ++cycle) {
        SCOPED_TRACE(cycle);
        const int running = 100 * cycle + 1, stopped = 100 * cycle + 50;
        for (int i = 0; i < kPerPhase; ++i) pty.writeRecord(streamRecord(startCommand(running + i)));
        EXPECT_EQ(range(running, running + kPerPhase - 1), readBinds(kPerPhase));
        link.stop();
        for (int i = 0; i < kPerPhase; ++i) pty.writeRecord(streamRecord(startCommand(stopped + i)));
        refused += kPerPhase;
        ASSERT_TRUE(log.waitFor(ANDROID_LOG_ERROR, kTag, kRefused, refused));
        link.start();
    }
    const int last = 1000;
    pty.writeRecord(streamRecord(startCommand(last)));
    EXPECT_EQ(range(last, last), readBinds(1));
    EXPECT_TRUE(pty.silentFor(100ms));
    EXPECT_EQ(refused, log.count(ANDROID_LOG_ERROR, kTag, kRefused));
    EXPECT_EQ(2 * refused + 1, recvLines());
    EXPECT_EQ(refused + 1, hostfakes::callCount("Mvd_Open"));
    for (int cycle = 0; cycle < 3; ++cycle) {
        for (int i = 0; i < kPerPhase; ++i) {
            EXPECT_TRUE(link.mCmdCallback->snapshot(100 * cycle + 1 + i));
            EXPECT_FALSE(link.mCmdCallback->snapshot(100 * cycle + 50 + i));
        }
    }
}

TEST_F(VtspFaultTest, DestroyUnderLoadReturnsAndClosesTheDevice) {
    startLink();
    std::atomic<bool> loading{true};
    std::atomic<int> written{0};
    // Starts and ends of one stream, written and answered without pause; the
    // modem side never blocks so it can always be told to stop.
    std::thread modem([&] {
        const int fd = pty.masterFd();
        std::vector<unsigned char> out, in(4096);
        size_t offset = 0;
        int n = 0;
        while (loading) {
            if (offset == out.size()) {
                StreamCommand c = startCommand(3);
                if (n++ % 2) c.code = _VTSP_CMD_STREAM_VIDEO_END;
                const VPR_Comm record = streamRecord(c);
                const auto* bytes = reinterpret_cast<const unsigned char*>(&record);
                out.assign(bytes, bytes + sizeof(record));
                offset = 0;
            }
            pollfd p{fd, POLLIN | POLLOUT, 0};
            if (poll(&p, 1, 10) <= 0) continue;
            if (p.revents & POLLIN) (void)!read(fd, in.data(), in.size());
            if (p.revents & POLLOUT) {
                const int flags = fcntl(fd, F_GETFL);
                fcntl(fd, F_SETFL, flags | O_NONBLOCK);
                const ssize_t w = write(fd, out.data() + offset, out.size() - offset);
                fcntl(fd, F_SETFL, flags);
                if (w > 0) offset += static_cast<size_t>(w);
                if (offset == out.size()) ++written;
            }
        }
    });
    EXPECT_TRUE(log.waitFor(ANDROID_LOG_DEBUG, kTag, "cmdRxFunc, recv msg 50, targetModule 0"));
    const auto before = Clock::now();
    destroyLink();
    EXPECT_LT(msSince(before), 3000);
    EXPECT_EQ(-1, link.mFd);
    loading = false;
    modem.join();
    EXPECT_GE(written.load(), 50);
}
