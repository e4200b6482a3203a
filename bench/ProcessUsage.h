// What the benchmark reads of its own process: resident memory, heap in use,
// CPU time, and the CPU time and wake-ups of named threads.
#ifndef QUELLBORN_BENCH_PROCESSUSAGE_H
#define QUELLBORN_BENCH_PROCESSUSAGE_H

#include <cstddef>
#include <map>
#include <string>

namespace processusage {

// VmRSS of /proc/self/status, in bytes.
size_t residentBytes();
// VmHWM: the most resident memory so far, in bytes; resetPeakResident()
// starts it again from the current figure (false where the kernel cannot).
size_t peakResidentBytes();
bool resetPeakResident();
// Bytes handed out by malloc and not yet freed.
size_t heapInUse();
// CPU time of every thread of the process so far, in nanoseconds.
long long processCpuNs();

// CPU time every CPU of the machine spent busy so far (all processes, the
// hypervisor's steal included), in seconds, and the number of CPUs.
double machineBusySeconds();
// Of that, the time spent in interrupts and in kernel threads (the kernel's
// own workers, which move the pseudo-terminal's bytes for this process too).
double kernelWorkSeconds();
unsigned cpuCount();

struct ThreadUsage {
    long long cpuNs = 0;       // user + system time the scheduler ran it
    long long wakeups = 0;     // voluntary + involuntary context switches
};
// Every thread of this process whose name starts with `prefix`, by name.
std::map<std::string, ThreadUsage> threadsNamed(const std::string& prefix);

}  // namespace processusage

#endif  // QUELLBORN_BENCH_PROCESSUSAGE_H
