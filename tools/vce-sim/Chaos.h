// vce-sim --chaos: random calls against the real engine. Steps come from
// ChaosGenerator, every one is checked against the simulator's invariants,
// and a step that breaks one (or never returns) ends the run: the steps so
// far are written as a scenario, shrunk to a short one that still breaks
// the same invariant (each candidate replayed in a fresh vce-sim process,
// since the engine is a process singleton), and the seed is printed so the
// run itself can be repeated.
#ifndef QUELLBORN_TOOLS_VCESIM_CHAOS_H
#define QUELLBORN_TOOLS_VCESIM_CHAOS_H

#include <cstdint>
#include <ostream>
#include <string>
#include <vector>

struct ChaosOptions {
    uint64_t seed = 0;
    long steps = 0;        // stop after this many steps (0: use seconds)
    double seconds = 0;    // or after this long (both 0: 200 steps)
    int actors = 1;        // threads playing steps at once
    std::string outDir;    // where failing scenarios are written ("." if empty)
    std::string self;      // this program, to replay candidates while shrinking
    bool verbose = false;  // print the timeline of every step
};

// Runs the chaos; returns the exit status (0 no violation, 1 a violation).
int runChaos(const ChaosOptions& options, std::ostream& out);

// Shrinks `lines` to a shorter list that still ends with `invariant`
// violated when replayed by `replay`; exposed for the tests.
using ChaosReplay = bool (*)(const std::vector<std::string>& lines, const std::string& invariant, void* context);
std::vector<std::string> shrinkSteps(std::vector<std::string> lines, const std::string& invariant, ChaosReplay replay,
                                     void* context, double budgetSeconds);

#endif  // QUELLBORN_TOOLS_VCESIM_CHAOS_H
