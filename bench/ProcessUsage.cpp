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

double machineBusySeconds() {
    // First line: "cpu user nice system idle iowait irq softirq steal ...", in clock ticks.
    std::istringstream in(firstLine("/proc/stat"));
    std::string cpu;
    long long user = 0, nice = 0, system = 0, idle = 0, iowait = 0, irq = 0, softirq = 0, steal = 0;
    in >> cpu >> user >> nice >> system >> idle >> iowait >> irq >> softirq >> steal;
    return static_cast<double>(user + nice + system + irq + softirq + steal) / static_cast<double>(sysconf(_SC_CLK_TCK));
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
