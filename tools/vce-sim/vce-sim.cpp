// vce-sim: plays a video call against the real engine on the host.
//
//   vce-sim                      the built-in call (scenarios/call.scn)
//   vce-sim --loopback           the built-in loopback session
//   vce-sim --scenario FILE      a scenario of your own (docs/scenario-format.md)
//   -v                           interleave the system's log lines
//   --msc FILE                   also write the call as an mscgen chart
//   --print-scenario             print the scenario text instead of playing it
//   --invariants                 check the engine's invariants after every step
//   --chaos [--seed N] [--steps N | --seconds S] [--actors K] [--out DIR]
//                                random calls with the invariants checked; a
//                                violation is shrunk to a scenario in DIR
//
// Exit status: 0 when every expectation (and invariant) held, 1 when one did
// not, 2 when the command line or the scenario is wrong (then nothing runs).
#include <unistd.h>

#include <chrono>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <iostream>
#include <sstream>
#include <string>

#include "BuiltInScenarios.h"
#include "Chaos.h"
#include "MscWriter.h"
#include "Scenario.h"
#include "Simulator.h"

namespace {

constexpr int kUsageError = 2;

struct CommandLine {
    std::string scenarioPath;
    bool loopback = false;
    bool verbose = false;
    bool printScenario = false;
    bool invariants = false;
    std::string mscPath;
    bool chaos = false;
    bool seedGiven = false;
    ChaosOptions chaosOptions;
};

int usage(std::ostream& out, int status) {
    out << "usage: vce-sim [--scenario FILE | --loopback] [-v] [--invariants] [--msc FILE] [--print-scenario]\n"
           "       vce-sim --chaos [--seed N] [--steps N | --seconds S] [--actors K] [--out DIR] [-v]\n"
           "\n"
           "Plays a video call against the real engine: the IMS client through the binder\n"
           "service, the modem through a pseudo-terminal standing in for its pipe, and the\n"
           "media libraries' events. Without --scenario it plays the built-in call.\n"
           "\n"
           "  --scenario FILE   play FILE (format: docs/scenario-format.md; - reads stdin)\n"
           "  --loopback        play the built-in loopback session instead of a modem call\n"
           "  -v                show the system's log lines in the timeline\n"
           "  --msc FILE        write the call as a chart for mscgen (mscgen -T png -o call.png FILE)\n"
           "  --print-scenario  print the scenario that would be played, and stop\n"
           "  --invariants      check the engine's invariants after every step; the first that\n"
           "                    does not hold ends the play\n"
           "  --chaos           play random steps of every actor with the invariants checked;\n"
           "                    a violation is shrunk to a short scenario written to DIR\n"
           "  --seed N          the chaos run's seed (a new one, printed, when not given)\n"
           "  --steps N, --seconds S   how long the chaos runs (default 200 steps)\n"
           "  --actors K        threads playing steps at once (default 1: every step checked)\n"
           "  --out DIR         where a failing chaos run writes its scenarios (default .)\n"
           "\n"
           "Exit status: 0 every expectation and invariant held, 1 one did not, 2 a usage or\n"
           "scenario error.\n";
    return status;
}

bool parseCommandLine(int argc, char** argv, CommandLine* cl) {
    for (int i = 1; i < argc; ++i) {
        const std::string arg = argv[i];
        const bool hasValue = i + 1 < argc;
        if (arg == "--scenario" && hasValue) {
            cl->scenarioPath = argv[++i];
        } else if (arg == "--msc" && hasValue) {
            cl->mscPath = argv[++i];
        } else if (arg == "--loopback") {
            cl->loopback = true;
        } else if (arg == "-v" || arg == "--verbose") {
            cl->verbose = true;
        } else if (arg == "--print-scenario") {
            cl->printScenario = true;
        } else if (arg == "--invariants") {
            cl->invariants = true;
        } else if (arg == "--chaos") {
            cl->chaos = true;
        } else if ((arg == "--seed" || arg == "--steps" || arg == "--seconds" || arg == "--actors") && hasValue) {
            char* end = nullptr;
            const char* value = argv[++i];
            const double number = strtod(value, &end);
            if (end == value || *end != '\0' || number < 0) {
                std::cerr << "vce-sim: expected a number after " << arg << " but found '" << value << "'\n";
                return false;
            }
            if (arg == "--seed") {
                cl->chaosOptions.seed = strtoull(value, nullptr, 10);
                cl->seedGiven = true;
            } else if (arg == "--steps") {
                cl->chaosOptions.steps = static_cast<long>(number);
            } else if (arg == "--seconds") {
                cl->chaosOptions.seconds = number;
            } else {
                cl->chaosOptions.actors = number < 1 ? 1 : static_cast<int>(number);
            }
        } else if (arg == "--out" && hasValue) {
            cl->chaosOptions.outDir = argv[++i];
        } else if (arg == "--scenario" || arg == "--msc" || arg == "--seed" || arg == "--steps" ||
                   arg == "--seconds" || arg == "--actors" || arg == "--out") {
            std::cerr << "vce-sim: expected a file after " << arg << " but found end of line\n";
            return false;
        } else {
            std::cerr << "vce-sim: expected an option but found '" << arg << "'\n";
            return false;
        }
    }
    if (cl->chaos && (cl->loopback || !cl->scenarioPath.empty())) {
        std::cerr << "vce-sim: --chaos makes its own steps: no --scenario or --loopback with it\n";
        return false;
    }
    if (cl->loopback && !cl->scenarioPath.empty()) {
        std::cerr << "vce-sim: --loopback and --scenario cannot be combined\n";
        return false;
    }
    return true;
}

bool loadScenario(const CommandLine& cl, std::string* name, std::string* text) {
    if (cl.scenarioPath.empty()) {
        *name = cl.loopback ? "built-in loopback" : "built-in call";
        *text = cl.loopback ? BuiltInScenarios::loopback() : BuiltInScenarios::call();
        return true;
    }
    *name = cl.scenarioPath;
    std::ostringstream buffer;
    if (cl.scenarioPath == "-") {
        buffer << std::cin.rdbuf();
    } else {
        std::ifstream file(cl.scenarioPath);
        if (!file) {
            std::cerr << "vce-sim: cannot read " << cl.scenarioPath << ": " << strerror(errno) << "\n";
            return false;
        }
        buffer << file.rdbuf();
    }
    *text = buffer.str();
    return true;
}

size_t expectationCount(const Scenario& scenario) {
    size_t n = 0;
    for (const ScenarioStep& step : scenario.steps()) n += step.actor == ScenarioStep::Actor::kExpect;
    return n;
}

bool writeMsc(const std::string& path, const Simulator& simulator) {
    std::ofstream file(path, std::ios::trunc);
    MscWriter::write(simulator.timeline().all(), file);
    file.close();
    if (!file) std::cerr << "vce-sim: cannot write " << path << "\n";
    return static_cast<bool>(file);
}

int report(const std::string& name, size_t expectations, const std::vector<std::string>& failures) {
    if (failures.empty()) {
        std::cout << "\nvce-sim: " << name << ": all " << expectations << " expectations held\n";
        return 0;
    }
    std::cout << "\nvce-sim: " << name << ": " << failures.size() << " of " << expectations
              << " expectations failed:\n";
    for (const std::string& failure : failures) std::cout << "  " << failure << "\n";
    return 1;
}

// This program's own file, for the chaos run's replays in new processes.
std::string selfPath(const char* argv0) {
    char path[4096];
    const ssize_t n = readlink("/proc/self/exe", path, sizeof(path) - 1);
    if (n <= 0) return argv0;
    path[n] = '\0';
    return path;
}

}  // namespace

int main(int argc, char** argv) {
    CommandLine cl;
    for (int i = 1; i < argc; ++i) {
        if (strcmp(argv[i], "-h") == 0 || strcmp(argv[i], "--help") == 0) return usage(std::cout, 0);
    }
    if (!parseCommandLine(argc, argv, &cl)) return usage(std::cerr, kUsageError);
    if (cl.chaos) {
        if (!cl.seedGiven) {
            cl.chaosOptions.seed = static_cast<uint64_t>(
                    std::chrono::steady_clock::now().time_since_epoch().count() ^ (uint64_t(getpid()) << 32));
        }
        cl.chaosOptions.self = selfPath(argv[0]);
        cl.chaosOptions.verbose = cl.verbose;
        return runChaos(cl.chaosOptions, std::cout);
    }
    std::string name, text, error;
    if (!loadScenario(cl, &name, &text)) return kUsageError;
    if (cl.printScenario) {
        std::cout << text;
        return 0;
    }
    Scenario scenario;
    if (!Scenario::parse(text, &scenario, &error)) {
        std::cerr << "vce-sim: " << name << ": " << error << "\nvce-sim: nothing was run\n";
        return kUsageError;
    }
    std::vector<std::string> failures;
    bool mscWritten = true;
    {
        Simulator::Options options;
        options.verbose = cl.verbose;
        options.colour = isatty(STDOUT_FILENO) && getenv("NO_COLOR") == nullptr;
        options.invariants = cl.invariants;
        Simulator simulator(options, std::cout);
        failures = simulator.play(scenario);
        if (!cl.mscPath.empty()) mscWritten = writeMsc(cl.mscPath, simulator);
    }
    const int status = report(name, expectationCount(scenario), failures);
    return mscWritten ? status : 1;
}
