// Runs the real system on the host and plays a scenario against it: the
// engine's link on a pseudo-terminal standing in for the modem pipe, the
// binder service registered as on a device, and three actors around it
// (IMS client, modem, media libraries). After each step it waits until the
// system has settled, then prints what happened and checks expectations.
#ifndef QUELLBORN_TOOLS_VCESIM_SIMULATOR_H
#define QUELLBORN_TOOLS_VCESIM_SIMULATOR_H

#include <ostream>
#include <string>
#include <vector>

#include "ImsClient.h"
#include "LogTap.h"
#include "MediaActor.h"
#include "ModemActor.h"
#include "Scenario.h"
#include "Timeline.h"
#include "TimelinePrinter.h"

class Simulator {
public:
    struct Options {
        bool verbose = false;  // interleave the system's log lines
        bool colour = false;
    };

    // Starts the system. Only one simulator may exist in a process: the
    // engine and its link are process singletons.
    Simulator(const Options& options, std::ostream& out);
    ~Simulator();
    Simulator(const Simulator&) = delete;
    Simulator& operator=(const Simulator&) = delete;

    // Plays every step; returns the expectations that did not hold, each
    // as "line N: <expectation>: <what was found>".
    std::vector<std::string> play(const Scenario& scenario);

    const Timeline& timeline() const { return mTimeline; }

private:
    struct Marks {
        size_t calls = 0;
        size_t logs = 0;
        size_t records = 0;
        size_t events = 0;
        int line = 0;
    };

    bool announce();
    bool startService();
    void run(const ScenarioStep& step);
    void settle();
    void harvestCalls(ScenarioStep::Actor actor);
    // "" when the expectation holds, else what was found instead.
    std::string check(const ScenarioStep& step) const;
    std::string checkCall(const ScenarioStep& step, bool wanted) const;
    std::string checkEvent(const ScenarioStep& step, bool wanted) const;
    std::string checkBind(const ScenarioStep& step) const;
    std::string checkLog(const ScenarioStep& step) const;
    // Runs dumpsys on the service with `args` (blank-separated) and shows its lines.
    void dump(const std::string& args);
    void note(TimelineEntry::Kind kind, const std::string& actor, const std::string& text);

    Timeline mTimeline;
    LogTap mLog;
    ModemActor mModem;
    const bool mAnnounced;
    MediaActor mMedia;
    const bool mServiceRegistered;
    ImsClient mClient;
    TimelinePrinter mPrinter;
    size_t mHarvested = 0;
    Marks mMarks;
    const bool mVerbose;
    std::string mLastDump;
};

#endif  // QUELLBORN_TOOLS_VCESIM_SIMULATOR_H
