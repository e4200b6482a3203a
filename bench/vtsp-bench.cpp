// vtsp-bench: the modem command link measured against the pipe's own limit.
//
// One run, one pseudo-terminal in raw mode standing in for the modem pipe:
//   1. several repetitions, each measuring the floor (a thread echoing whole
//      3664-byte records on the device side) and right after it the link (the
//      real VtspManager and dispatcher, the host stand-ins as the media
//      engine) under three loggers: one that discards, Debian's stderr logger
//      and one that costs what a handset's does; start-to-bind latency and
//      modify throughput, judged on the medians of the link/floor ratios;
//   2. a flood: a million mixed commands over many streams written as fast
//      as the pipe takes them; every one handled, in order, in bounded memory;
//   3. memory per stream and per queued command;
//   4. the idle link's CPU time and wake-ups.
// A machine busy with other work makes latency verdicts meaningless: the run
// then says "noisy" instead of judging.
#include <android/log.h>
#include <fcntl.h>
#include <malloc.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <chrono>
#include <condition_variable>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "CmdBuffer.h"
#include "CameraCodecParameter.h"
#include "CmdCallbackMvd.h"
#include "CmdLockQueue.h"
#include "HandsetLogger.h"
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
constexpr int kWarmUpRounds = 100;
const char* const kLinkThreadPrefix = "tVtspCmd";
// Beyond these, a latency or rate verdict would judge the machine, not the
// link: other work taking a tenth of the machine's CPUs while the
// repetitions ran, or the floor's own median moving by half from one
// repetition to the next.
constexpr double kNoisyMachineShare = 0.10;
constexpr double kNoisyFloorSpread = 0.5;
// The flood: streams alive at once, and the commands of one stream's life
// (a start, modifies, an end).
constexpr size_t kFloodStreams = 50;
constexpr size_t kFloodLifetime = 16;
constexpr size_t kPeakResidentTarget = 16u << 20;
// Targets, as ratios link/floor.
constexpr double kP50Target = 2;
constexpr double kP99Target = 4;
constexpr double kRateTarget = 0.5;
constexpr double kIdleCpuTargetMs = 1;

struct Options {
    int repeats = 5;
    size_t latencyRounds = 1000;
    size_t throughputRecords = 10000;
    size_t floodCommands = 1000000;
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

VPR_Comm streamRecord(int32_t code, uint32_t streamId) {
    vtspcodec::StreamCommand c;
    c.code = code;
    c.streamId = streamId;
    c.localAddr = vtspcodec::address("10.0.0.1", static_cast<uint16_t>(6000 + 2 * (streamId % 20000)));
    c.remoteAddr = vtspcodec::address("192.168.1.2", 5000);
    c.localVideoAsBwKbps = 500;
    return vtspcodec::streamRecord(c);
}

VPR_Comm startRecord(uint32_t streamId) {
    return streamRecord(android::_VTSP_CMD_STREAM_VIDEO_START, streamId);
}

VPR_Comm modifyRecord(uint32_t streamId) {
    return streamRecord(android::_VTSP_CMD_STREAM_VIDEO_MODITY, streamId);
}

// Discards every line; liblog has already formatted it by then.
void discardLogger(const struct __android_logger_data*, const char*) {}

// The loggers the link is measured under.
enum class Logging { Discarding, Stderr, Handset };
constexpr Logging kLoggings[] = {Logging::Discarding, Logging::Stderr, Logging::Handset};

const char* loggingName(Logging l) {
    switch (l) {
        case Logging::Discarding: return "logger that discards";
        case Logging::Stderr: return "Debian's stderr logger";
        case Logging::Handset: return "handset-like logger";
    }
    return "?";
}

// Installs one of the loggers for the length of a measurement. Debian's
// stderr logger writes each line with one system call into `target` (stderr
// is put back after).
class ScopedLogging {
public:
    ScopedLogging(Logging logging, const std::string& target) {
        if (logging == Logging::Handset) mHandset = std::make_unique<HandsetLogger>(discardLogger);
        if (logging != Logging::Stderr) return;
        fflush(stderr);
        mSavedStderr = dup(STDERR_FILENO);
        const int fd = open(target.c_str(), O_WRONLY | O_CREAT | O_APPEND, 0644);
        if (fd < 0) die("cannot open the log target");
        dup2(fd, STDERR_FILENO);
        close(fd);
        __android_log_set_logger(__android_log_stderr_logger);
    }
    ~ScopedLogging() {
        mHandset.reset();
        if (mSavedStderr < 0) return;
        fflush(stderr);
        dup2(mSavedStderr, STDERR_FILENO);
        close(mSavedStderr);
        __android_log_set_logger(discardLogger);
    }
    ScopedLogging(const ScopedLogging&) = delete;
    ScopedLogging& operator=(const ScopedLogging&) = delete;

private:
    int mSavedStderr = -1;
    std::unique_ptr<HandsetLogger> mHandset;
};

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

// A link on the pseudo-terminal for the length of one measurement, with the
// fake engine's state of earlier measurements forgotten.
class ScopedLink {
public:
    explicit ScopedLink(const char* device) : mLink((hostfakes::reset(), device)) {
        if (!mLink.init() || mLink.mFd < 0) die("the link cannot open the device");
    }
    ~ScopedLink() { mLink.destroy(); }
    ScopedLink(const ScopedLink&) = delete;
    ScopedLink& operator=(const ScopedLink&) = delete;
    android::VtspManager& link() { return mLink; }

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

// One logger's link against the floor measured just before it, over every
// repetition.
struct Comparison {
    Repeated p50, p99, rate;                      // the link's own figures
    Repeated p50Ratio, p99Ratio, rateRatio;       // link / floor
    Repeated p50Added, p99Added;                  // link - floor, microseconds
    Repeated heapPerStream;
    CpuPerCommand cpuPerStart, cpuPerModify;      // summed; divided by `runs`
    int runs = 0;

    void add(const PipeFigures& floor, const LinkFigures& link) {
        const LatencyStats& l = link.pipe.latency;
        p50.add(l.p50Us());
        p99.add(l.p99Us());
        rate.add(link.pipe.recordsPerSecond);
        p50Ratio.add(l.p50Us() / floor.latency.p50Us());
        p99Ratio.add(l.p99Us() / floor.latency.p99Us());
        rateRatio.add(link.pipe.recordsPerSecond / floor.recordsPerSecond);
        p50Added.add(l.p50Us() - floor.latency.p50Us());
        p99Added.add(l.p99Us() - floor.latency.p99Us());
        heapPerStream.add(static_cast<double>(link.heapPerStream));
        for (const auto& [thread, us] : link.cpuPerStart) cpuPerStart[thread] += us;
        for (const auto& [thread, us] : link.cpuPerModify) cpuPerModify[thread] += us;
        ++runs;
    }
};

struct FloorSeries {
    Repeated p50, p99, rate;
    void add(const PipeFigures& f) {
        p50.add(f.latency.p50Us());
        p99.add(f.latency.p99Us());
        rate.add(f.recordsPerSecond);
    }
};

// The share of the machine's CPUs that work other than this process took
// since the meter was made (the hypervisor's steal counts as other work).
class MachineLoad {
public:
    MachineLoad()
            : mBusy(processusage::machineBusySeconds()),
              mKernel(processusage::kernelWorkSeconds()),
              mOwnNs(processusage::processCpuNs()),
              mStart(Clock::now()) {}
    // Other processes' share of the machine. The kernel's workers and
    // interrupts are left out: most of their time here is the pipe's own
    // traffic, which floor and link pay alike.
    double otherShare() const {
        const double busy = processusage::machineBusySeconds() - mBusy;
        const double kernel = processusage::kernelWorkSeconds() - mKernel;
        const double own = static_cast<double>(processusage::processCpuNs() - mOwnNs) / 1e9;
        const double capacity = secondsSince(mStart) * processusage::cpuCount();
        const double other = busy - kernel - own;
        return capacity <= 0 || other <= 0 ? 0 : other / capacity;
    }

private:
    double mBusy;
    double mKernel;
    long long mOwnNs;
    Clock::time_point mStart;
};

// What the fake media engine itself keeps per open stream, so that it can
// be told apart from the system's share.
long long fakeEngineHeapPerStream(size_t streams) {
    hostfakes::reset();
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

// How far heap in use moves between samples when nothing is kept, so that
// flatness is judged against the allocator's own behaviour: commands made on
// one thread and released on another through a queue, as the link does,
// sampled each time every command has been released. The tolerance is twice
// the widest spread seen plus one command's allocation.
long long allocatorTolerance(size_t commands) {
    using Queue = android::CmdLockQueue<std::shared_ptr<android::CmdBuffer>>;
    const VPR_Comm record = modifyRecord(kFirstStreamId);
    size_t before = processusage::heapInUse();
    long long oneCommand = 0;
    {
        const auto held = android::CmdBuffer::fromRecord(record);
        oneCommand = static_cast<long long>(processusage::heapInUse()) - static_cast<long long>(before);
    }
    Queue queue;
    queue.start();
    std::thread consumer([&queue] {
        std::shared_ptr<android::CmdBuffer> taken;
        while (queue.waitAndPop(taken)) taken.reset();
    });
    constexpr int kStretches = 5;
    long long low = 0, high = 0;
    for (int s = 0; s < kStretches; ++s) {
        for (size_t i = 0; i < commands / kStretches; ++i) {
            queue.pushAndSignal(android::CmdBuffer::fromRecord(record));
            queue.waitForRoom(android::VtspManager::kRxHighWater, android::VtspManager::kRxLowWater);
        }
        while (queue.size() != 0 || android::CmdBuffer::con.load() != android::CmdBuffer::des.load()) {
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
        }
        const long long heap = static_cast<long long>(processusage::heapInUse());
        if (s == 0) low = high = heap;
        low = std::min(low, heap);
        high = std::max(high, heap);
    }
    queue.destroy();
    consumer.join();
    return 2 * (high - low) + oneCommand;
}

// The flood: command i of a run belongs to one of kFloodStreams streams
// alive at once; each stream lives for kFloodLifetime commands (a start,
// modifies, an end), then the next generation of streams takes its place.
struct FloodCommand {
    int32_t code;
    uint32_t streamId;
};

FloodCommand floodCommand(size_t i) {
    const size_t perGeneration = kFloodStreams * kFloodLifetime;
    const size_t generation = i / perGeneration, within = i % perGeneration;
    const size_t step = within / kFloodStreams, slot = within % kFloodStreams;
    const int32_t code = step == 0                    ? android::_VTSP_CMD_STREAM_VIDEO_START
                         : step == kFloodLifetime - 1 ? android::_VTSP_CMD_STREAM_VIDEO_END
                                                      : android::_VTSP_CMD_STREAM_VIDEO_MODITY;
    return {code, static_cast<uint32_t>(generation * kFloodStreams + slot + 1)};
}

// Every stream command the handling thread takes is dumped at info level
// under "cmdbuffer": counting those lines counts the commands handled.
std::atomic<size_t> sDumped{0};
void countingLogger(const struct __android_logger_data* data, const char*) {
    if (data->priority == ANDROID_LOG_INFO && data->tag != nullptr && strcmp(data->tag, "cmdbuffer") == 0) {
        sDumped.fetch_add(1, std::memory_order_relaxed);
    }
}

struct MemorySample {
    size_t commands = 0;
    size_t resident = 0;
    size_t heap = 0;
};

struct FloodFigures {
    size_t written = 0;
    size_t handled = 0;
    size_t binds = 0;
    size_t bindsOutOfOrder = 0;
    size_t streamsLeft = 0;
    size_t peakQueue = 0;
    size_t peakResident = 0;
    bool peakResidentReset = false;
    double seconds = 0;
    std::vector<MemorySample> samples;  // before, half-way and at the end, each once drained
};

// Waits until the handling thread has taken `count` commands; false when it
// stops making progress for seconds.
bool waitHandled(size_t count) {
    size_t last = sDumped.load();
    auto progress = Clock::now();
    while (sDumped.load() < count) {
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
        const size_t now = sDumped.load();
        if (now != last) {
            last = now;
            progress = Clock::now();
        } else if (secondsSince(progress) > 10) {
            return false;
        }
    }
    return true;
}

// Waits until the handling thread has taken `count` commands and every
// command and reply made so far has been released again (the link holds
// nothing in flight); false when it stops making progress for seconds.
bool waitDrained(size_t count) {
    if (!waitHandled(count)) return false;
    const auto start = Clock::now();
    while (android::CmdBuffer::con.load() != android::CmdBuffer::des.load()) {
        if (secondsSince(start) > 2) return false;
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }
    return true;
}

// The modem writes the flood as fast as the pipe takes it from a thread of
// its own, pausing once half-way until this thread has sampled memory; this
// thread reads the bind requests and checks that they answer the starts in
// the order they were written.
FloodFigures measureFlood(ModemPty& pty, const Options& o) {
    FloodFigures f;
    const size_t perGeneration = kFloodStreams * kFloodLifetime;
    const size_t total = std::max<size_t>(1, (o.floodCommands + perGeneration - 1) / perGeneration) * perGeneration;
    const size_t half = total / 2 / perGeneration * perGeneration;
    __android_log_set_logger(countingLogger);
    {
        ScopedLink scoped(pty.devicePath());
        android::VtspManager& link = scoped.link();
        const int master = pty.masterFd();
        sDumped = 0;
        // Memory the earlier phases freed but the allocator kept would count
        // as the flood's: hand it back first.
        malloc_trim(0);
        const auto sample = [&f](size_t commands) {
            f.samples.push_back({commands, processusage::residentBytes(), processusage::heapInUse()});
        };
        sample(0);
        f.peakResidentReset = processusage::resetPeakResident();

        std::mutex mutex;
        std::condition_variable halfSampled;
        bool resume = false;
        std::atomic<size_t> written{0};
        const auto start = Clock::now();
        std::thread modem([&] {
            for (size_t i = 0; i < total; ++i) {
                if (i == half) {
                    std::unique_lock<std::mutex> lock(mutex);
                    halfSampled.wait(lock, [&] { return resume; });
                }
                const FloodCommand c = floodCommand(i);
                if (!writeWhole(master, streamRecord(c.code, c.streamId))) die("flood write failed");
                written.fetch_add(1, std::memory_order_relaxed);
            }
        });
        VPR_Comm in{};
        const auto readBinds = [&](size_t from, size_t to) {
            for (size_t i = from; i < to; ++i) {
                const FloodCommand c = floodCommand(i);
                if (c.code != android::_VTSP_CMD_STREAM_VIDEO_START) continue;
                if (!readWhole(master, &in)) die("flood: no bind request");
                ++f.binds;
                f.bindsOutOfOrder += vtspcodec::readBindRequest(in).streamId != static_cast<int32_t>(c.streamId);
            }
        };
        readBinds(0, half);
        if (waitDrained(half)) sample(half);
        {
            std::lock_guard<std::mutex> lock(mutex);
            resume = true;
        }
        halfSampled.notify_one();
        readBinds(half, total);
        waitHandled(total);
        f.seconds = secondsSince(start);
        modem.join();
        if (waitDrained(total)) sample(total);
        f.written = written.load();
        f.handled = sDumped.load();
        f.streamsLeft = link.mCmdCallback->streamCount();
        f.peakQueue = link.mRxQueue.peakSize();
        f.peakResident = processusage::peakResidentBytes();
    }
    __android_log_set_logger(discardLogger);
    return f;
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

// The handling thread's work for one start, step by step, on this thread
// alone: no hand-offs, no waiting. Microseconds per start, best of several
// passes (the least disturbed one).
struct HandlingSteps {
    double make = 0;      // the queued command built from the record, turned to host order
    double dump = 0;      // its dump, through liblog to the logger
    double dispatch = 0;  // the dispatcher's start: stream, engine calls, debug lines
    double dispatchQuiet = 0;  // the same with the debug lines dropped by the log level
    double reply = 0;     // the bind request turned to wire order, both buffers released
    double line = 0;      // one debug line through liblog
    size_t lines = 0;     // lines a start writes
};

std::atomic<size_t> sLines{0};
void lineCountingLogger(const struct __android_logger_data*, const char*) {
    sLines.fetch_add(1, std::memory_order_relaxed);
}

HandlingSteps measureHandlingSteps(size_t starts) {
    using std::chrono::duration;
    auto table = std::make_shared<android::CameraCodecParameter>();
    table->fill(android::CameraCodecParameter::CODEC_H264);
    table->fill(android::CameraCodecParameter::CODEC_OTHER);
    __android_log_set_logger(lineCountingLogger);
    HandlingSteps best{1e9, 1e9, 1e9, 1e9, 1e9, 1e9, 0};
    const auto keepBest = [](double& slot, double total, size_t n) {
        slot = std::min(slot, total / static_cast<double>(n));
    };
    constexpr int kPasses = 5;
    for (int pass = 0; pass < 2 * kPasses; ++pass) {
        const bool quiet = pass % 2 == 1;
        __android_log_set_minimum_priority(quiet ? ANDROID_LOG_INFO : ANDROID_LOG_VERBOSE);
        hostfakes::reset();
        android::CmdCallbackMvd dispatcher(table);
        double make = 0, dump = 0, dispatch = 0, reply = 0;
        const size_t linesBefore = sLines.load();
        for (size_t i = 0; i < starts; ++i) {
            const VPR_Comm record = startRecord(static_cast<uint32_t>(i + 1));
            const auto t0 = Clock::now();
            auto cmd = android::CmdBuffer::fromRecord(record);
            cmd->translate(true);
            const auto t1 = Clock::now();
            cmd->print();
            const auto t2 = Clock::now();
            android::CmdBuffer* bind = dispatcher.parse(*cmd);
            const auto t3 = Clock::now();
            if (bind != nullptr) {
                std::shared_ptr<android::CmdBuffer> owned(bind);
                owned->translate(false);
            }
            cmd.reset();
            const auto t4 = Clock::now();
            make += duration<double, std::micro>(t1 - t0).count();
            dump += duration<double, std::micro>(t2 - t1).count();
            dispatch += duration<double, std::micro>(t3 - t2).count();
            reply += duration<double, std::micro>(t4 - t3).count();
        }
        if (quiet) {
            keepBest(best.dispatchQuiet, dispatch, starts);
            continue;
        }
        best.lines = (sLines.load() - linesBefore) / starts;
        keepBest(best.make, make, starts);
        keepBest(best.dump, dump, starts);
        keepBest(best.dispatch, dispatch, starts);
        keepBest(best.reply, reply, starts);
        const auto t0 = Clock::now();
        for (size_t i = 0; i < starts; ++i) {
            __android_log_print(ANDROID_LOG_DEBUG, "CmdclbMVD", "%s: Mvd_SetRmtAddr, ip:%s, port: %d, streamId %d, ret %d",
                                "socketRemoteParamConfig", "192.168.1.2", 5000, static_cast<int>(i), 0);
        }
        keepBest(best.line, duration<double, std::micro>(Clock::now() - t0).count(), starts);
    }
    __android_log_set_minimum_priority(ANDROID_LOG_VERBOSE);
    __android_log_set_logger(discardLogger);
    hostfakes::reset();
    return best;
}

const char* judge(bool noisy, bool held) { return noisy ? "noisy, no verdict" : held ? "held" : "MISSED"; }

// "median [lowest..highest]"
std::string spread(const Repeated& r, const char* format) {
    char text[96];
    const std::string f = std::string(format) + " [" + format + ".." + format + "]";
    snprintf(text, sizeof(text), f.c_str(), r.median(), r.min(), r.max());
    return text;
}

void printCpu(const char* name, const Comparison& c) {
    printf("  %-26s", name);
    for (const auto& [thread, us] : c.cpuPerStart) printf(" %s %5.1f", thread.c_str(), us / c.runs);
    printf("  |");
    for (const auto& [thread, us] : c.cpuPerModify) printf(" %s %5.1f", thread.c_str(), us / c.runs);
    printf("\n");
}

Options parseOptions(int argc, char** argv) {
    Options o;
    for (int i = 1; i < argc; ++i) {
        const std::string arg = argv[i];
        const bool hasValue = i + 1 < argc;
        if (arg == "--quick") {
            o.repeats = 3;
            o.latencyRounds = 200;
            o.throughputRecords = 1000;
            o.floodCommands = 20000;
            o.queuedCommands = 10000;
            o.idleSeconds = 1;
        } else if (arg == "--repeats" && hasValue) {
            o.repeats = std::atoi(argv[++i]);
        } else if (arg == "--rounds" && hasValue) {
            o.latencyRounds = std::strtoul(argv[++i], nullptr, 10);
        } else if (arg == "--records" && hasValue) {
            o.throughputRecords = std::strtoul(argv[++i], nullptr, 10);
        } else if (arg == "--flood" && hasValue) {
            o.floodCommands = std::strtoul(argv[++i], nullptr, 10);
        } else if (arg == "--idle-seconds" && hasValue) {
            o.idleSeconds = std::atoi(argv[++i]);
        } else if (arg == "--log" && hasValue) {
            o.logTarget = argv[++i];
        } else {
            const bool help = arg == "--help";
            fprintf(help ? stdout : stderr,
                    "usage: vtsp-bench [--quick] [--repeats N] [--rounds N] [--records N] [--flood N]\n"
                    "                  [--idle-seconds N] [--log FILE]\n"
                    "  --repeats N       floor and link measured in turn N times (5)\n"
                    "  --rounds N        start-to-bind and echo round trips per repetition (1000)\n"
                    "  --records N       records per throughput run (10000)\n"
                    "  --flood N         commands in the flood (1000000)\n"
                    "  --idle-seconds N  how long the idle link is watched (10)\n"
                    "  --log FILE        where Debian's stderr logger writes (/dev/null)\n"
                    "  --quick           small counts and 1 s idle, for a smoke run\n");
            exit(help ? 0 : 2);
        }
    }
    if (o.repeats <= 0 || o.latencyRounds == 0 || o.throughputRecords == 0 || o.floodCommands == 0 ||
        o.idleSeconds <= 0) {
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

    // Floor and link in turn, so that whatever the machine does to one
    // during a run it does to the other as well.
    FloorSeries floor;
    std::map<Logging, Comparison> links;
    const MachineLoad load;
    for (int r = 0; r < o.repeats; ++r) {
        const PipeFigures f = measureFloor(pty, o);
        floor.add(f);
        for (Logging logging : kLoggings) {
            ScopedLogging installed(logging, o.logTarget);
            links[logging].add(f, measureLink(pty, o));
        }
    }
    const double otherShare = load.otherShare();
    const bool noisy = otherShare > kNoisyMachineShare || floor.p50.relativeSpread() > kNoisyFloorSpread;

    const long long fakePerStream = fakeEngineHeapPerStream(o.latencyRounds);
    const long long perQueued = heapPerQueuedCommand(o.queuedCommands);
    const long long tolerance = allocatorTolerance(o.queuedCommands);
    const FloodFigures flood = measureFlood(pty, o);
    const IdleFigures idle = measureIdle(pty, o);
    const HandlingSteps steps = measureHandlingSteps(o.latencyRounds);

    printf("vtsp-bench: %d repetitions of %zu round trips and %zu throughput records each, "
           "3664-byte records, pseudo-terminal in raw mode\n",
           o.repeats, o.latencyRounds, o.throughputRecords);
    printf("machine: %u CPUs; other processes took %.0f%% of them during the repetitions; floor p50 spread %.0f%% "
           "-> %s\n\n",
           processusage::cpuCount(), 100 * otherShare, 100 * floor.p50.relativeSpread(),
           noisy ? "NOISY: latency and rate verdicts withheld" : "quiet enough to judge");
    printf("figures: median [lowest..highest] over the repetitions; latency in us\n");
    printf("  %-26s %-24s %-24s %s\n", "", "start-to-bind p50", "p99", "records/s");
    printf("  %-26s %-24s %-24s %s\n", "floor: echo of a record", spread(floor.p50, "%.1f").c_str(),
           spread(floor.p99, "%.1f").c_str(), spread(floor.rate, "%.0f").c_str());
    for (Logging logging : kLoggings) {
        const Comparison& c = links[logging];
        printf("  %-26s %-24s %-24s %s\n", loggingName(logging), spread(c.p50, "%.1f").c_str(),
               spread(c.p99, "%.1f").c_str(), spread(c.rate, "%.0f").c_str());
    }
    printf("  (floor: write a record, read it back; link: write START, read its bind request;\n"
           "   throughput: MODIFY records on one stream, timed until a last START is answered)\n\n");
    printf("  %-26s %s\n", "CPU per command (us)", "START | MODIFY");
    for (Logging logging : kLoggings) printCpu(loggingName(logging), links[logging]);
    printf("  handling work per START on one thread, no hand-offs (us, best of 5, logger discarding):\n"
           "    make %.2f  dump %.2f  dispatch %.2f (%.2f with debug lines dropped by the level)  reply %.2f"
           "  = %.2f;  %zu lines, %.3f per debug line\n\n",
           steps.make, steps.dump, steps.dispatch, steps.dispatchQuiet, steps.reply,
           steps.make + steps.dump + steps.dispatch + steps.reply, steps.lines, steps.line);

    printf("flood: %zu commands (%zu streams at a time, each a start, %zu modifies and an end) in %.1f s, "
           "%.0f commands/s\n",
           flood.written, kFloodStreams, kFloodLifetime - 2, flood.seconds,
           static_cast<double>(flood.handled) / flood.seconds);
    printf("  handled %zu of %zu written; %zu bind requests, %zu out of order; %zu streams left open\n",
           flood.handled, flood.written, flood.binds, flood.bindsOutOfOrder, flood.streamsLeft);
    printf("  peak receive queue %zu commands; peak resident %.1f MiB%s\n", flood.peakQueue,
           static_cast<double>(flood.peakResident) / (1 << 20),
           flood.peakResidentReset ? "" : " (over the whole run: the kernel cannot restart the peak)");
    printf("  drained:");
    for (const MemorySample& m : flood.samples) {
        printf("  after %zu: resident %zu KiB, heap %zu B;", m.commands, m.resident / 1024, m.heap);
    }
    printf("\n");
    const Comparison& discarding = links[Logging::Discarding];
    printf("memory: %.0f bytes per stream (system; the fake engine keeps %lld more), %lld bytes per queued "
           "command\n",
           discarding.heapPerStream.median() - static_cast<double>(fakePerStream), fakePerStream, perQueued);
    printf("idle link, %.1f s: link threads (%zu) CPU %.3f ms, %lld wake-ups; process CPU %.3f ms\n\n",
           idle.seconds, idle.linkThreads, static_cast<double>(idle.linkCpuNs) / 1e6, idle.linkWakeups,
           static_cast<double>(idle.processCpuNs) / 1e6);

    printf("verdicts (ratios link/floor per repetition: median [lowest..highest], then the link's added "
           "time in us):\n");
    for (Logging logging : kLoggings) {
        const Comparison& c = links[logging];
        printf("  %s\n", loggingName(logging));
        printf("    start-to-bind p50 %sx  %s us  (<= %.0fx: %s)\n", spread(c.p50Ratio, "%.2f").c_str(),
               spread(c.p50Added, "%+.1f").c_str(), kP50Target, judge(noisy, c.p50Ratio.median() <= kP50Target));
        printf("    start-to-bind p99 %sx  %s us  (<= %.0fx: %s)\n", spread(c.p99Ratio, "%.2f").c_str(),
               spread(c.p99Added, "%+.1f").c_str(), kP99Target, judge(noisy, c.p99Ratio.median() <= kP99Target));
        printf("    modify rate       %sx  (>= %.1fx: %s)\n", spread(c.rateRatio, "%.2f").c_str(), kRateTarget,
               judge(noisy, c.rateRatio.median() >= kRateTarget));
    }
    const bool allHandled = flood.handled == flood.written && flood.binds * kFloodLifetime == flood.written &&
                            flood.bindsOutOfOrder == 0 && flood.streamsLeft == 0;
    printf("  flood: handled = written, in order: %s; peak resident %.1f MiB (< %zu MiB: %s)\n",
           allHandled ? "held" : "MISSED", static_cast<double>(flood.peakResident) / (1 << 20),
           kPeakResidentTarget >> 20, flood.peakResident < kPeakResidentTarget ? "held" : "MISSED");
    // Over the second half anything kept per command would show as hundreds
    // of kilobytes; the allocator's own movement is what the tolerance allows.
    const long long growth = flood.samples.size() == 3 ? static_cast<long long>(flood.samples[2].heap) -
                                                                 static_cast<long long>(flood.samples[1].heap)
                                                       : -1;
    const bool flat = flood.samples.size() == 3 && std::llabs(growth) <= tolerance;
    printf("  heap over the flood's second half: %+lld B (flat within %lld B, the allocator's own movement: %s)\n",
           growth, tolerance, flood.samples.size() == 3 ? (flat ? "held" : "MISSED") : "MISSED (no sample)");
    const double idleMsPer10s = static_cast<double>(idle.linkCpuNs) / 1e6 * 10.0 / idle.seconds;
    printf("  idle link threads CPU %.3f ms per 10 s (< %.0f ms: %s)\n", idleMsPer10s, kIdleCpuTargetMs,
           idleMsPer10s < kIdleCpuTargetMs ? "held" : "MISSED");
    // Figures are reported, never asserted: the status says only that the run completed.
    return 0;
}
