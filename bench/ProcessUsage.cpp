#include "ProcessUsage.h"

#include <dirent.h>
#include <malloc.h>
#include <time.h>
#include <unistd.h>

#include <fstream>
#include <sstream>

namespace processusage {

namespace {

// The value of a "Key:   value" line of a /proc status file, 0 if absent.
long long statusField(const std::string& path, const std::string& key) {
    std::ifstream in(path);
    std::string line;
    while (std::getline(in, line)) {
        if (line.compare(0, key.size() + 1, key + ":") == 0) {
            return std::stoll(line.substr(key.size() + 1));
        }
    }
    return 0;
}

std::string firstLine(const std::string& path) {
    std::ifstream in(path);
    std::string line;
    std::getline(in, line);
    return line;
}

}  // namespace

size_t residentBytes() {
    return static_cast<size_t>(statusField("/proc/self/status", "VmRSS")) * 1024;
}

size_t peakResidentBytes() {
    return static_cast<size_t>(statusField("/proc/self/status", "VmHWM")) * 1024;
}

bool resetPeakResident() {
    std::ofstream out("/proc/self/clear_refs");
    out << "5";
    out.flush();
    return static_cast<bool>(out);
}

namespace {

// The machine's first /proc/stat line: "cpu user nice system idle iowait irq
// softirq steal ...", in clock ticks.
struct MachineTicks {
    long long user = 0, nice = 0, system = 0, idle = 0, iowait = 0, irq = 0, softirq = 0, steal = 0;
};

MachineTicks machineTicks() {
    std::istringstream in(firstLine("/proc/stat"));
    std::string cpu;
    MachineTicks t;
    in >> cpu >> t.user >> t.nice >> t.system >> t.idle >> t.iowait >> t.irq >> t.softirq >> t.steal;
    return t;
}

double ticksToSeconds(long long ticks) { return static_cast<double>(ticks) / static_cast<double>(sysconf(_SC_CLK_TCK)); }

}  // namespace

double machineBusySeconds() {
    const MachineTicks t = machineTicks();
    return ticksToSeconds(t.user + t.nice + t.system + t.irq + t.softirq + t.steal);
}

namespace {

// The kernel marks its own threads with PF_KTHREAD in the flags of
// /proc/PID/stat.
constexpr unsigned long kKernelThreadFlag = 0x00200000;

// utime + stime of a kernel thread, in clock ticks; 0 for any other process.
long long kernelThreadTicks(const std::string& pid) {
    const std::string stat = firstLine("/proc/" + pid + "/stat");
    // The name in parentheses may hold spaces: fields are counted after it.
    const size_t close = stat.rfind(')');
    if (close == std::string::npos) return 0;
    std::istringstream in(stat.substr(close + 1));
    std::string field;
    unsigned long flags = 0;
    long long utime = 0, stime = 0;
    // Fields 3..8 (state .. tty_nr, tpgid), 9 flags, 10..13 fault counters, 14 utime, 15 stime.
    for (int i = 3; i <= 8; ++i) in >> field;
    in >> flags;
    for (int i = 10; i <= 13; ++i) in >> field;
    in >> utime >> stime;
    return (flags & kKernelThreadFlag) != 0 ? utime + stime : 0;
}

}  // namespace

double kernelWorkSeconds() {
    const MachineTicks t = machineTicks();
    long long ticks = t.irq + t.softirq;
    if (DIR* dir = opendir("/proc")) {
        while (const dirent* entry = readdir(dir)) {
            if (entry->d_name[0] < '0' || entry->d_name[0] > '9') continue;
            ticks += kernelThreadTicks(entry->d_name);
        }
        closedir(dir);
    }
    return ticksToSeconds(ticks);
}

unsigned cpuCount() {
    const long n = sysconf(_SC_NPROCESSORS_ONLN);
    return n > 0 ? static_cast<unsigned>(n) : 1;
}

size_t heapInUse() {
    return mallinfo2().uordblks;
}

long long processCpuNs() {
    struct timespec ts {};
    clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &ts);
    return static_cast<long long>(ts.tv_sec) * 1000000000LL + ts.tv_nsec;
}

std::map<std::string, ThreadUsage> threadsNamed(const std::string& prefix) {
    std::map<std::string, ThreadUsage> out;
    DIR* dir = opendir("/proc/self/task");
    if (dir == nullptr) return out;
    while (const dirent* entry = readdir(dir)) {
        if (entry->d_name[0] == '.') continue;
        const std::string task = std::string("/proc/self/task/") + entry->d_name;
        const std::string name = firstLine(task + "/comm");
        if (name.compare(0, prefix.size(), prefix) != 0) continue;
        ThreadUsage usage;
        // schedstat: nanoseconds on the CPU, nanoseconds waiting, time slices.
        std::istringstream(firstLine(task + "/schedstat")) >> usage.cpuNs;
        usage.wakeups = statusField(task + "/status", "voluntary_ctxt_switches") +
                        statusField(task + "/status", "nonvoluntary_ctxt_switches");
        out[name] = usage;
    }
    closedir(dir);
    return out;
}

}  // namespace processusage
