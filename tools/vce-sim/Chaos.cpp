#include "Chaos.h"

#include <unistd.h>

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <mutex>
#include <sstream>
#include <thread>

#include "ChaosGenerator.h"
#include "Scenario.h"
#include "Simulator.h"

namespace {

using Clock = std::chrono::steady_clock;

// A step that has not returned after this long is a hang. Generous: the
// sanitizer builds run the engine ten times slower, and a link stall lasts
// up to a third of a second.
constexpr int kWatchdogSeconds = 30;
// A replay that reproduces a hang is cut off after this long.
constexpr int kReplayHangSeconds = 15;
constexpr int kReplaySeconds = 120;
constexpr double kShrinkBudgetSeconds = 300;
constexpr long kDefaultSteps = 200;
// With several actors, the steps between two quiet checks of the invariants.
constexpr int kRound = 8;

class NullBuffer : public std::streambuf {
protected:
    int overflow(int c) override { return c; }
};

ScenarioStep stepOf(const std::string& line) {
    Scenario scenario;
    std::string error;
    if (!Scenario::parse(line, &scenario, &error) || scenario.steps().size() != 1) {
        // The generator only writes valid steps; a bad one is its bug.
        fprintf(stderr, "vce-sim: chaos generated an unreadable step '%s': %s\n", line.c_str(), error.c_str());
        abort();
    }
    return scenario.steps()[0];
}

std::string invariantOf(const std::string& violation) {
    const std::string prefix = "invariant ";
    const size_t at = violation.find(prefix);
    if (at == std::string::npos) return violation;
    const size_t end = violation.find(':', at);
    return violation.substr(at + prefix.size(), end == std::string::npos ? std::string::npos : end - at - prefix.size());
}

std::string scenarioText(const std::vector<std::string>& lines, const std::string& header) {
    std::string text = header;
    for (const std::string& line : lines) text += line + "\n";
    return text;
}

bool writeFile(const std::string& path, const std::string& text) {
    std::ofstream file(path, std::ios::trunc);
    file << text;
    return static_cast<bool>(file);
}

struct ReplayContext {
    std::string self;
    std::string path;
};

// Plays the candidate in a fresh process: the engine and its link are
// process singletons, so only a new process starts from the same state.
bool replayInProcess(const std::vector<std::string>& lines, const std::string& invariant, void* context) {
    const ReplayContext& replay = *static_cast<ReplayContext*>(context);
    if (!writeFile(replay.path, scenarioText(lines, ""))) return false;
    const int limit = invariant == "watchdog" ? kReplayHangSeconds : kReplaySeconds;
    const std::string command = "timeout -k 5 " + std::to_string(limit) + " '" + replay.self +
                                "' --invariants --scenario '" + replay.path + "' 2>&1";
    FILE* pipe = popen(command.c_str(), "r");
    if (pipe == nullptr) return false;
    std::string output;
    char buffer[4096];
    size_t n;
    while ((n = fread(buffer, 1, sizeof(buffer), pipe)) > 0) output.append(buffer, n);
    const int status = pclose(pipe);
    const int code = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    if (invariant == "watchdog") return code == 124 || code == 137;
    return code == 1 && output.find("invariant " + invariant + ":") != std::string::npos;
}

class ChaosRun {
public:
    ChaosRun(const ChaosOptions& options, std::ostream& out)
        : mOptions(options),
          mOut(out),
          mQuiet(&mNull),
          mSimulator(simulatorOptions(), options.verbose ? out : mQuiet) {}

    int run();

private:
    static Simulator::Options simulatorOptions() {
        Simulator::Options o;
        o.invariants = true;
        return o;
    }
    bool keepGoing(long done) const;
    std::string playSequential();
    std::string playConcurrent();
    void watch();
    int fail(const std::string& violation);
    std::string outPath(const std::string& suffix) const;

    const ChaosOptions mOptions;
    std::ostream& mOut;
    NullBuffer mNull;
    std::ostream mQuiet;
    Simulator mSimulator;
    const Clock::time_point mStart = Clock::now();

    std::mutex mLinesLock;
    std::vector<std::string> mLines;
    std::atomic<long> mStepsDone{0};
    std::atomic<int64_t> mStepStartedNs{0};  // 0 while no step runs
    std::atomic<bool> mFinished{false};
    std::mutex mWatchLock;
    std::condition_variable mWatchWake;
};

bool ChaosRun::keepGoing(long done) const {
    if (mOptions.steps > 0) return done < mOptions.steps;
    if (mOptions.seconds > 0) {
        return std::chrono::duration<double>(Clock::now() - mStart).count() < mOptions.seconds;
    }
    return done < kDefaultSteps;
}

std::string ChaosRun::outPath(const std::string& suffix) const {
    return (mOptions.outDir.empty() ? std::string(".") : mOptions.outDir) + "/chaos-" + std::to_string(mOptions.seed) +
           suffix + ".scn";
}

int64_t nowNs() {
    return std::chrono::duration_cast<std::chrono::nanoseconds>(Clock::now().time_since_epoch()).count();
}

std::string ChaosRun::playSequential() {
    ChaosGenerator generator(mOptions.seed);
    for (long done = 0; keepGoing(done); ++done) {
        const std::string line = generator.next();
        {
            std::lock_guard<std::mutex> lock(mLinesLock);
            mLines.push_back(line);
        }
        mStepStartedNs.store(nowNs());
        const std::string violated = mSimulator.step(stepOf(line));
        mStepStartedNs.store(0);
        mStepsDone.fetch_add(1);
        mSimulator.flush();
        if (!violated.empty()) return violated;
    }
    return "";
}

std::string ChaosRun::playConcurrent() {
    // Each actor thread plays steps of its own actor, as binder threads, the
    // modem and the media engine do on a handset; every kRound steps they
    // meet, the system settles and the invariants are checked.
    const int actors = mOptions.actors;
    std::mutex lock;
    std::condition_variable wake;
    int arrived = 0;
    long round = 0;
    bool stop = false;
    std::string violated;
    auto actorThread = [&](int index) {
        const ChaosGenerator::Actor kinds[] = {ChaosGenerator::Actor::kModem, ChaosGenerator::Actor::kClient,
                                               ChaosGenerator::Actor::kMedia, ChaosGenerator::Actor::kAny};
        ChaosGenerator generator(mOptions.seed * 31 + static_cast<uint64_t>(index));
        for (long myRound = 0;; ++myRound) {
            for (int i = 0; i < kRound; ++i) {
                std::string line = generator.next(kinds[index % 4]);
                // Link restarts and stalls stay with the last thread, and only
                // between rounds, so every round has a well-defined link.
                if (line.compare(0, 5, "link ") == 0) line = generator.next(ChaosGenerator::Actor::kModem);
                {
                    std::lock_guard<std::mutex> guard(mLinesLock);
                    mLines.push_back(line);
                }
                mSimulator.perform(stepOf(line));
                mStepsDone.fetch_add(1);
            }
            std::unique_lock<std::mutex> guard(lock);
            if (++arrived == actors) {
                mStepStartedNs.store(nowNs());
                const std::string found = mSimulator.checkQuiet();
                mStepStartedNs.store(0);
                mSimulator.flush();
                if (!found.empty()) violated = found;
                stop = !found.empty() || !keepGoing(mStepsDone.load());
                arrived = 0;
                ++round;
                wake.notify_all();
            } else {
                const long waitingFor = round;
                wake.wait(guard, [&] { return round != waitingFor; });
            }
            if (stop) return;
            mStepStartedNs.store(nowNs());
        }
    };
    std::vector<std::thread> threads;
    mStepStartedNs.store(nowNs());
    for (int i = 0; i < actors; ++i) threads.emplace_back(actorThread, i);
    for (std::thread& t : threads) t.join();
    return violated;
}

void ChaosRun::watch() {
    std::unique_lock<std::mutex> lock(mWatchLock);
    while (!mFinished.load()) {
        mWatchWake.wait_for(lock, std::chrono::seconds(1));
        const int64_t started = mStepStartedNs.load();
        if (started == 0 || nowNs() - started < int64_t{kWatchdogSeconds} * 1000000000) continue;
        std::string last;
        {
            std::lock_guard<std::mutex> guard(mLinesLock);
            last = mLines.empty() ? "" : mLines.back();
        }
        mOut << "\nvce-sim: chaos: invariant watchdog: a step has not returned after " << kWatchdogSeconds
             << " s (last step: " << last << ")" << std::endl;
        // Every thread's stack, where a debugger is at hand.
        const std::string gdb = "command -v gdb >/dev/null && gdb -p " + std::to_string(getpid()) +
                                " -batch -ex 'thread apply all bt' 2>/dev/null | grep -E '^(Thread|#)'";
        if (system(gdb.c_str()) != 0) mOut << "(no debugger to print the threads' stacks)" << std::endl;
        _exit(fail("invariant watchdog: step did not return"));
    }
}

int ChaosRun::fail(const std::string& violation) {
    std::vector<std::string> lines;
    {
        std::lock_guard<std::mutex> lock(mLinesLock);
        lines = mLines;
    }
    const std::string invariant = invariantOf(violation);
    mOut << "\nvce-sim: chaos: seed " << mOptions.seed << ": " << violation << " after " << lines.size() << " steps"
         << std::endl;
    const std::string header = "# vce-sim --chaos --seed " + std::to_string(mOptions.seed) + ": invariant " +
                               invariant + " violated\n# replay: vce-sim --invariants --scenario FILE\n";
    const std::string whole = outPath("");
    if (writeFile(whole, scenarioText(lines, header))) mOut << "vce-sim: chaos: the steps: " << whole << std::endl;
    if (mOptions.self.empty()) return 1;
    ReplayContext context{mOptions.self, outPath("-candidate")};
    mOut << "vce-sim: chaos: shrinking (each candidate replayed in a new process)..." << std::endl;
    const std::vector<std::string> small = shrinkSteps(lines, invariant, replayInProcess, &context, kShrinkBudgetSeconds);
    unlink(context.path.c_str());
    const std::string shrunk = outPath("-min");
    if (writeFile(shrunk, scenarioText(small, header))) {
        mOut << "vce-sim: chaos: shrunk to " << small.size() << " steps: " << shrunk << "\n"
             << scenarioText(small, "") << std::flush;
    }
    return 1;
}

int ChaosRun::run() {
    mOut << "vce-sim: chaos: seed " << mOptions.seed << ", " << mOptions.actors << " actor thread"
         << (mOptions.actors == 1 ? "" : "s") << std::endl;
    std::thread watchdog([this] { watch(); });
    const std::string violated = mOptions.actors > 1 ? playConcurrent() : playSequential();
    {
        std::lock_guard<std::mutex> lock(mWatchLock);
        mFinished.store(true);
    }
    mWatchWake.notify_all();
    watchdog.join();
    if (!violated.empty()) return fail(violated);
    mOut << "\nvce-sim: chaos: seed " << mOptions.seed << ": " << mStepsDone.load() << " steps, 0 violations"
         << std::endl;
    return 0;
}

}  // namespace

std::vector<std::string> shrinkSteps(std::vector<std::string> lines, const std::string& invariant, ChaosReplay replay,
                                     void* context, double budgetSeconds) {
    // Delta debugging: drop ever smaller chunks while the violation stays.
    const Clock::time_point start = Clock::now();
    auto inBudget = [&] { return std::chrono::duration<double>(Clock::now() - start).count() < budgetSeconds; };
    size_t chunks = 2;
    while (lines.size() >= 2 && inBudget()) {
        const size_t size = (lines.size() + chunks - 1) / chunks;
        bool removed = false;
        for (size_t begin = 0; begin < lines.size() && inBudget(); begin += size) {
            std::vector<std::string> candidate(lines.begin(), lines.begin() + static_cast<std::ptrdiff_t>(begin));
            const size_t end = std::min(lines.size(), begin + size);
            candidate.insert(candidate.end(), lines.begin() + static_cast<std::ptrdiff_t>(end), lines.end());
            if (!candidate.empty() && replay(candidate, invariant, context)) {
                lines = candidate;
                chunks = std::max<size_t>(chunks - 1, 2);
                removed = true;
                break;
            }
        }
        if (!removed) {
            if (size == 1) break;
            chunks = std::min(chunks * 2, lines.size());
        }
    }
    return lines;
}

int runChaos(const ChaosOptions& options, std::ostream& out) {
    ChaosRun run(options, out);
    return run.run();
}
