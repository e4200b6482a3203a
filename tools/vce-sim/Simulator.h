// Runs the real system on the host and plays a scenario against it: the
// engine's link on a pseudo-terminal standing in for the modem pipe, the
// binder service registered as on a device, and three actors around it
// (IMS client, modem, media libraries). After each step it waits until the
// system has settled, then prints what happened and checks expectations.
#ifndef QUELLBORN_TOOLS_VCESIM_SIMULATOR_H
#define QUELLBORN_TOOLS_VCESIM_SIMULATOR_H

#include <mutex>
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
        // Check the engine's invariants after every step; the first one
        // that does not hold ends the play (docs/scenario-format.md).
        bool invariants = false;
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

    // Plays one step, checking the invariants when the options ask for it;
    // "" when they hold, else "invariant NAME: what was found".
    std::string step(const ScenarioStep& step);
    // Plays one step without waiting for the system to settle; safe to call
    // from several threads at once (one step per actor at a time).
    void perform(const ScenarioStep& step);
    // Waits until the system has settled and checks the invariants that
    // hold at rest whatever ran concurrently before.
    std::string checkQuiet();
    // Prints what the last steps caused.
    void flush() { mPrinter.print(mTimeline.takeNew()); }

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
    void runLink(const ScenarioStep& step);
    std::string checkInvariants(const ScenarioStep& step);
    std::string checkRecords(const ScenarioStep& step);
    std::string checkFraming(size_t from) const;
    std::string checkStreams();
    std::string checkCallState(const ScenarioStep& step) const;
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
    const bool mInvariants;
    const bool mVerbose;
    bool mLinkStopped = false;
    // Bind requests the modem should have had by now, and the record count
    // they are counted from (moved on when the link drops what it queued).
    size_t mBindsExpected = 0;
    size_t mBindsFrom = 0;
    // The stream a start is for existed before it (so knows its local end).
    bool mStartFoundStream = false;
    bool mDeathEndsCall = false;
    // One step per actor at a time when several threads play.
    std::mutex mActorLocks[4];
    size_t mQuietRecords = 0;
    // The calls read so far for suspends, and the suspend still in force.
    size_t mSuspendScan = 0;
    std::string mSuspendedBy;
    size_t mHarvested = 0;
    Marks mMarks;
    std::string mLastDump;
};

#endif  // QUELLBORN_TOOLS_VCESIM_SIMULATOR_H
