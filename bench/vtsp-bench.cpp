// vtsp-bench: the modem command link measured against the pipe's own limit.
//
// One run, one pseudo-terminal in raw mode standing in for the modem pipe:
//   1. the floor: a thread echoing whole 3664-byte records on the device side;
//   2. the link (the real VtspManager and dispatcher, the host stand-ins as
//      the media engine) with the system's logging as shipped and with a
//      logger that discards: start-to-bind latency and modify throughput;
//   3. memory per stream and per queued command, and across a million commands;
//   4. the idle link's CPU time and wake-ups;
// then the ratios link/floor against the targets.
#include <android/log.h>
#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <map>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "CmdBuffer.h"
#include "CmdLockQueue.h"
#include "HostFakes.h"
#include "LatencyStats.h"
#include "ModemPty.h"
#include "Mvd.h"
#include "ProcessUsage.h"
#include "VtspManager.h"
#include "VtspRecord.h"

using android::VPR_Comm;
using Clock = std::chrono::steady_clock;

namespace {

// A trailer value no modem sends: tells the echo thread to finish.
constexpr uint32_t kEchoStopModule = 0xB0B0;
constexpr uint32_t kFirstStreamId = 1;
constexpr int kWarmUpRounds = 200;
const char* const kLinkThreadPrefix = "tVtspCmd";

struct Options {
    size_t latencyRounds = 2000;
    size_t throughputRecords = 20000;
    size_t millionCommands = 1000000;
    size_t queuedCommands = 100000;
    int idleSeconds = 10;
    std::string logTarget = "/dev/null";
};

double secondsSince(Clock::time_point start) {
    return std::chrono::duration<double>(Clock::now() - start).count();
}

// One whole record through `io` (read or write), across short transfers and
// interruptions; false when the pipe fails or ends.
template <typename Io, typename Byte>
bool transferWhole(Io io, int fd, Byte* p) {
    size_t left = sizeof(VPR_Comm);
    while (left > 0) {
        const ssize_t n = io(fd, p, left);
        if (n < 0 && errno == EINTR) continue;
        if (n <= 0) return false;
        p += n;
        left -= static_cast<size_t>(n);
    }
    return true;
}

bool writeWhole(int fd, const VPR_Comm& record) {
    return transferWhole(::write, fd, reinterpret_cast<const char*>(&record));
}

bool readWhole(int fd, VPR_Comm* record) {
    return transferWhole(::read, fd, reinterpret_cast<char*>(record));
}

void die(const char* what) {
    fprintf(stderr, "vtsp-bench: %s\n", what);
    exit(2);
}

vtspcodec::StreamCommand streamCommand(int32_t code, uint32_t streamId) {
    vtspcodec::StreamCommand c;
    c.code = code;
    c.streamId = streamId;
    c.localAddr = vtspcodec::address("10.0.0.1", static_cast<uint16_t>(6000 + 2 * (streamId % 20000)));
    c.remoteAddr = vtspcodec::address("192.168.1.2", 5000);
    c.localVideoAsBwKbps = 500;
    return c;
}

VPR_Comm startRecord(uint32_t streamId) {
    return vtspcodec::streamRecord(streamCommand(android::_VTSP_CMD_STREAM_VIDEO_START, streamId));
}

VPR_Comm modifyRecord(uint32_t streamId) {
    return vtspcodec::streamRecord(streamCommand(android::_VTSP_CMD_STREAM_VIDEO_MODITY, streamId));
}

// The figures both the floor and the link are measured by.
struct PipeFigures {
    LatencyStats latency;
    double recordsPerSecond = 0;
};

// Writes `count` copies of `record` then `last` from a thread of its own,
// reads `replies` whole records on this thread, and answers the records per
// second from the first write to the last read.
double pushThrough(int master, const VPR_Comm& record, size_t count, const VPR_Comm& last,
                   size_t replies) {
    const auto start = Clock::now();
    std::thread writer([&] {
        for (size_t i = 0; i < count; ++i) {
            if (!writeWhole(master, record)) die("write to the pseudo-terminal failed");
        }
        if (!writeWhole(master, last)) die("write to the pseudo-terminal failed");
    });
    VPR_Comm in{};
    for (size_t i = 0; i < replies; ++i) {
        if (!readWhole(master, &in)) die("read from the pseudo-terminal failed");
    }
    const double seconds = secondsSince(start);
    writer.join();
    return static_cast<double>(count) / seconds;
}

// The physical floor: the device side echoes each whole record it reads.
PipeFigures measureFloor(ModemPty& pty, const Options& o) {
    const int device = open(pty.devicePath(), O_RDWR | O_NOCTTY);
    if (device < 0) die("cannot open the device side");
    std::thread echo([device] {
        VPR_Comm record{};
        while (readWhole(device, &record)) {
            if (!writeWhole(device, record) || record.targetModule == kEchoStopModule) break;
        }
    });
    PipeFigures f;
    const int master = pty.masterFd();
    const VPR_Comm record = startRecord(kFirstStreamId);
    VPR_Comm in{};
    f.latency.reserve(o.latencyRounds);
    for (size_t i = 0; i < kWarmUpRounds + o.latencyRounds; ++i) {
        const auto t0 = Clock::now();
        if (!writeWhole(master, record) || !readWhole(master, &in)) die("echo failed");
        if (i >= kWarmUpRounds) f.latency.add(Clock::now() - t0);
    }
    // Every record comes back, the last one included.
    f.recordsPerSecond = pushThrough(master, record, o.throughputRecords, record, o.throughputRecords + 1);

    VPR_Comm stop = record;
    stop.targetModule = kEchoStopModule;
    if (!writeWhole(master, stop) || !readWhole(master, &in)) die("echo did not stop");
    echo.join();
    close(device);
    return f;
}

// Discards every line; liblog has already formatted it by then.
void discardLogger(const struct __android_logger_data*, const char*) {}

// Sends the system's log lines where a handset's would go: through liblog's
// own logger, one write per line, into `target` (stderr is put back after).
class ShippedLogging {
public:
    explicit ShippedLogging(const std::string& target) {
        fflush(stderr);
        mSavedStderr = dup(STDERR_FILENO);
        const int fd = open(target.c_str(), O_WRONLY | O_CREAT | O_APPEND, 0644);
        if (fd < 0) die("cannot open the log target");
        dup2(fd, STDERR_FILENO);
        close(fd);
        __android_log_set_logger(__android_log_stderr_logger);
    }
    ~ShippedLogging() {
        fflush(stderr);
        dup2(mSavedStderr, STDERR_FILENO);
        close(mSavedStderr);
        __android_log_set_logger(discardLogger);
    }
    ShippedLogging(const ShippedLogging&) = delete;
    ShippedLogging& operator=(const ShippedLogging&) = delete;

private:
    int mSavedStderr = -1;
};

// A link on the pseudo-terminal for the length of one measurement.
class ScopedLink {
public:
    explicit ScopedLink(const char* device) : mLink(device) {
        if (!mLink.init() || mLink.mFd < 0) die("the link cannot open the device");
    }
    ~ScopedLink() { mLink.destroy(); }
    ScopedLink(const ScopedLink&) = delete;
    ScopedLink& operator=(const ScopedLink&) = delete;

private:
    android::VtspManager mLink;
};

// Heap bytes added since `before` (heapInUse), shared out over `items`.
long long heapPerItemSince(size_t before, size_t items) {
    const long long added = static_cast<long long>(processusage::heapInUse()) - static_cast<long long>(before);
    return added / static_cast<long long>(items);
}

// CPU time each link thread spent per command over a stretch of work, in
// microseconds, by thread name: where the link's own share of the time goes.
using CpuPerCommand = std::map<std::string, double>;

class LinkThreadMeter {
public:
    LinkThreadMeter() : mBefore(processusage::threadsNamed(kLinkThreadPrefix)) {}

    // What each link thread used since the meter was made, by name.
    std::map<std::string, processusage::ThreadUsage> used() const {
        std::map<std::string, processusage::ThreadUsage> out;
        for (const auto& [name, after] : processusage::threadsNamed(kLinkThreadPrefix)) {
            const auto before = mBefore.find(name);
            if (before == mBefore.end()) continue;
            out[name] = {after.cpuNs - before->second.cpuNs, after.wakeups - before->second.wakeups};
        }
        return out;
    }

    CpuPerCommand perCommand(size_t commands) const {
        CpuPerCommand out;
        for (const auto& [name, usage] : used()) {
            out[name] = static_cast<double>(usage.cpuNs) / 1000.0 / static_cast<double>(commands);
        }
        return out;
    }

private:
    std::map<std::string, processusage::ThreadUsage> mBefore;
};

struct LinkFigures {
    PipeFigures pipe;
    long long heapPerStream = 0;
    CpuPerCommand cpuPerStart;
    CpuPerCommand cpuPerModify;
};

// Start-to-bind latency over fresh streams, then modifies of the first one
// until a last start's bind shows that every one before it was handled.
LinkFigures measureLink(ModemPty& pty, const Options& o) {
    ScopedLink link(pty.devicePath());
    const int master = pty.masterFd();
    VPR_Comm in{};
    uint32_t id = kFirstStreamId;
    for (int i = 0; i < kWarmUpRounds; ++i) {
        if (!writeWhole(master, startRecord(id++)) || !readWhole(master, &in)) die("no bind request");
    }
    LinkFigures f;
    f.pipe.latency.reserve(o.latencyRounds);
    const size_t heapBefore = processusage::heapInUse();
    const LinkThreadMeter startCpu;
    for (size_t i = 0; i < o.latencyRounds; ++i) {
        const VPR_Comm start = startRecord(id++);
        const auto t0 = Clock::now();
        if (!writeWhole(master, start) || !readWhole(master, &in)) die("no bind request");
        f.pipe.latency.add(Clock::now() - t0);
    }
    f.cpuPerStart = startCpu.perCommand(o.latencyRounds);
    f.heapPerStream = heapPerItemSince(heapBefore, o.latencyRounds);
    const LinkThreadMeter modifyCpu;
    f.pipe.recordsPerSecond =
            pushThrough(master, modifyRecord(kFirstStreamId), o.throughputRecords, startRecord(id++), 1);
    f.cpuPerModify = modifyCpu.perCommand(o.throughputRecords);
    return f;
}

// What the fake media engine itself keeps per open stream, so that it can
// be told apart from the system's share.
long long fakeEngineHeapPerStream(size_t streams) {
    std::vector<unsigned int> ids(streams);
    const size_t before = processusage::heapInUse();
    for (unsigned int& id : ids) Mvd_Open("10.0.0.1", 6000, &id);
    const long long per = heapPerItemSince(before, streams);
    for (unsigned int id : ids) Mvd_Close(id);
    return per;
}

// The receive thread's queue, filled the way it fills it, with nobody taking.
long long heapPerQueuedCommand(size_t commands) {
    const VPR_Comm record = modifyRecord(kFirstStreamId);
    android::CmdLockQueue<std::shared_ptr<android::CmdBuffer>> queue;
    queue.start();
    const size_t before = processusage::heapInUse();
    for (size_t i = 0; i < commands; ++i) queue.pushAndSignal(android::CmdBuffer::fromRecord(record));
    const long long per = heapPerItemSince(before, commands);
    queue.destroy();
    return per;
}

// Memory read at the start, the middle and the end of a long run of
// commands, each time after the link has drained what it was given.
struct MemorySample {
    size_t commands = 0;
    size_t resident = 0;
    size_t heap = 0;
};
struct MemoryFigures {
    std::vector<MemorySample> samples;
    double seconds = 0;
};

// A million modifies through a running link. The start that closes each
// stretch finds the engine refusing to open a stream: it is still answered,
// and leaves nothing behind that would read as growth.
MemoryFigures measureMillion(ModemPty& pty, const Options& o) {
    ScopedLink link(pty.devicePath());
    const int master = pty.masterFd();
    VPR_Comm in{};
    if (!writeWhole(master, startRecord(kFirstStreamId)) || !readWhole(master, &in)) die("no bind request");
    hostfakes::setResult("Mvd_Open", -1);
    const VPR_Comm modify = modifyRecord(kFirstStreamId);
    const VPR_Comm last = startRecord(kFirstStreamId + 1);
    pushThrough(master, modify, o.throughputRecords, last, 1);  // warm-up

    MemoryFigures m;
    const auto sample = [&m](size_t commands) {
        m.samples.push_back({commands, processusage::residentBytes(), processusage::heapInUse()});
    };
    sample(0);
    const auto start = Clock::now();
    const size_t half = o.millionCommands / 2;
    pushThrough(master, modify, half, last, 1);
    sample(half);
    pushThrough(master, modify, o.millionCommands - half, last, 1);
    m.seconds = secondsSince(start);
    sample(o.millionCommands);
    hostfakes::clearResult("Mvd_Open");
    return m;
}

struct IdleFigures {
    double seconds = 0;
    long long processCpuNs = 0;
    long long linkCpuNs = 0;
    long long linkWakeups = 0;
    size_t linkThreads = 0;
};

IdleFigures measureIdle(ModemPty& pty, const Options& o) {
    ScopedLink link(pty.devicePath());
    // Let the three threads reach the calls they block in.
    std::this_thread::sleep_for(std::chrono::milliseconds(200));
    const LinkThreadMeter threads;
    const long long cpuBefore = processusage::processCpuNs();
    const auto start = Clock::now();
    std::this_thread::sleep_for(std::chrono::seconds(o.idleSeconds));
    IdleFigures f;
    f.seconds = secondsSince(start);
    f.processCpuNs = processusage::processCpuNs() - cpuBefore;
    for (const auto& [name, usage] : threads.used()) {
        f.linkCpuNs += usage.cpuNs;
        f.linkWakeups += usage.wakeups;
        ++f.linkThreads;
    }
    return f;
}

void printPipe(const char* name, const PipeFigures& f) {
    printf("  %-34s %9.1f %9.1f %9.1f %12.0f\n", name, f.latency.p50Us(), f.latency.p99Us(),
           f.latency.maxUs(), f.recordsPerSecond);
}

void printCpu(const char* name, const CpuPerCommand& start, const CpuPerCommand& modify) {
    printf("  %-34s", name);
    for (const auto& [thread, us] : start) printf(" %s %5.1f", thread.c_str(), us);
    printf("  |");
    for (const auto& [thread, us] : modify) printf(" %s %5.1f", thread.c_str(), us);
    printf("\n");
}

const char* verdict(bool held) { return held ? "held" : "MISSED"; }

Options parseOptions(int argc, char** argv) {
    Options o;
    for (int i = 1; i < argc; ++i) {
        const std::string arg = argv[i];
        const bool hasValue = i + 1 < argc;
        if (arg == "--quick") {
            o.latencyRounds = 300;
            o.throughputRecords = 2000;
            o.millionCommands = 20000;
            o.queuedCommands = 10000;
            o.idleSeconds = 1;
        } else if (arg == "--commands" && hasValue) {
            o.millionCommands = std::strtoul(argv[++i], nullptr, 10);
        } else if (arg == "--rounds" && hasValue) {
            o.latencyRounds = std::strtoul(argv[++i], nullptr, 10);
        } else if (arg == "--records" && hasValue) {
            o.throughputRecords = std::strtoul(argv[++i], nullptr, 10);
        } else if (arg == "--idle-seconds" && hasValue) {
            o.idleSeconds = std::atoi(argv[++i]);
        } else if (arg == "--log" && hasValue) {
            o.logTarget = argv[++i];
        } else {
            const bool help = arg == "--help";
            fprintf(help ? stdout : stderr,
                    "usage: vtsp-bench [--quick] [--rounds N] [--records N] [--commands N]\n"
                    "                  [--idle-seconds N] [--log FILE]\n"
                    "  --rounds N        start-to-bind and echo round trips (2000)\n"
                    "  --records N       records per throughput run (20000)\n"
                    "  --commands N      modifies for the memory run (1000000)\n"
                    "  --idle-seconds N  how long the idle link is watched (10)\n"
                    "  --log FILE        where the shipped logging writes (/dev/null)\n"
                    "  --quick           small counts and 1 s idle, for a smoke run\n");
            exit(help ? 0 : 2);
        }
    }
    if (o.latencyRounds == 0 || o.throughputRecords == 0 || o.millionCommands == 0 || o.idleSeconds <= 0) {
        die("counts must be positive");
    }
    return o;
}

}  // namespace

int main(int argc, char** argv) {
    const Options o = parseOptions(argc, argv);
    // Every line the system writes on a handset, debug lines included.
    __android_log_set_minimum_priority(ANDROID_LOG_VERBOSE);
    __android_log_set_logger(discardLogger);
    hostfakes::setRecording(false);
    ModemPty pty;

    const PipeFigures floor = measureFloor(pty, o);
    LinkFigures shipped;
    {
        ShippedLogging logging(o.logTarget);
        shipped = measureLink(pty, o);
    }
    const LinkFigures discarding = measureLink(pty, o);
    const long long fakePerStream = fakeEngineHeapPerStream(o.latencyRounds);
    const long long perQueued = heapPerQueuedCommand(o.queuedCommands);
    const MemoryFigures million = measureMillion(pty, o);
    const IdleFigures idle = measureIdle(pty, o);

    printf("vtsp-bench: %zu round trips, %zu records per throughput run, 3664-byte records, "
           "pseudo-terminal in raw mode\n\n", o.latencyRounds, o.throughputRecords);
    printf("  %-34s %9s %9s %9s %12s\n", "latency (us) / throughput", "p50", "p99", "max", "records/s");
    printPipe("floor: echo of a whole record", floor);
    printPipe("link, logging as shipped", shipped.pipe);
    printPipe("link, logger that discards", discarding.pipe);
    printf("  (floor: write a record, read it back; link: write START, read its bind request;\n"
           "   throughput: MODIFY records on one stream, timed until a last START is answered)\n\n");
    printf("  %-34s %s\n", "CPU per command (us), by thread", "START | MODIFY");
    printCpu("link, logging as shipped", shipped.cpuPerStart, shipped.cpuPerModify);
    printCpu("link, logger that discards", discarding.cpuPerStart, discarding.cpuPerModify);
    printf("\n");

    const double idleCpuMsPer10s = static_cast<double>(idle.processCpuNs) / 1e6 * 10.0 / idle.seconds;
    printf("idle link, %.1f s: process CPU %.3f ms, link threads (%zu) CPU %.3f ms, %lld wake-ups\n",
           idle.seconds, static_cast<double>(idle.processCpuNs) / 1e6, idle.linkThreads,
           static_cast<double>(idle.linkCpuNs) / 1e6, idle.linkWakeups);
    printf("memory: %lld bytes per stream (system; the fake engine keeps %lld more), "
           "%lld bytes per queued command\n",
           discarding.heapPerStream - fakePerStream, fakePerStream, perQueued);
    printf("        %zu commands in %.1f s:", o.millionCommands, million.seconds);
    for (const MemorySample& m : million.samples) {
        printf("  after %zu: resident %zu KiB, heap in use %zu B;", m.commands, m.resident / 1024, m.heap);
    }
    printf("\n\n");

    const auto ratios = [&](const char* mode, const LinkFigures& l) {
        const double p50 = l.pipe.latency.p50Us() / floor.latency.p50Us();
        const double p99 = l.pipe.latency.p99Us() / floor.latency.p99Us();
        const double max = l.pipe.latency.maxUs() / floor.latency.maxUs();
        const double rate = l.pipe.recordsPerSecond / floor.recordsPerSecond;
        printf("  %-28s start-to-bind p50 %5.2fx (<= 2: %s)  p99 %5.2fx (<= 4: %s)  max %5.2fx"
               "  modify rate %5.2fx (>= 0.5: %s)\n",
               mode, p50, verdict(p50 <= 2), p99, verdict(p99 <= 4), max, rate, verdict(rate >= 0.5));
    };
    printf("ratios link/floor:\n");
    ratios("logging as shipped", shipped);
    ratios("logger that discards", discarding);
    // The first stretch may still deepen the receive queue's index (its
    // size follows the deepest backlog). Over the second, anything kept per
    // command would show as hundreds of kilobytes; a few dozen bytes either
    // way are the allocator's per-thread caches, which count as in use.
    const auto growth = [&million](size_t from, size_t to) {
        return static_cast<long long>(million.samples[to].heap) - static_cast<long long>(million.samples[from].heap);
    };
    const bool idleHeld = idleCpuMsPer10s < 1.0;
    constexpr long long kAllocatorNoise = 1024;
    const bool flat = growth(1, 2) < kAllocatorNoise;
    printf("  idle CPU %.3f ms per 10 s (< 1: %s)  heap growth over the commands: %lld B, then %lld B "
           "(flat: %s)\n",
           idleCpuMsPer10s, verdict(idleHeld), growth(0, 1), growth(1, 2), verdict(flat));
    // Figures are reported, never asserted: the status says only that the run completed.
    return 0;
}
