// The modem's side of the simulated call: a pseudo-terminal whose other end
// the engine's link opens as its pipe (QUELLBORN_MODEM_PIPE is pointed at it
// on construction, before the link starts). Steps are written into it as
// records; a reader thread takes every record the link writes back.
#ifndef QUELLBORN_TOOLS_VCESIM_MODEMACTOR_H
#define QUELLBORN_TOOLS_VCESIM_MODEMACTOR_H

#include <atomic>
#include <mutex>
#include <thread>
#include <vector>

#include "ModemPty.h"
#include "StepSyntax.h"
#include "Timeline.h"

class ModemActor {
public:
    explicit ModemActor(Timeline* timeline);
    ~ModemActor();
    ModemActor(const ModemActor&) = delete;
    ModemActor& operator=(const ModemActor&) = delete;

    const char* devicePath() const { return mPty.devicePath(); }

    // Writes the step's record into the pipe.
    void send(const StepSyntax::Step& step);

    // Stops reading the pipe for a while, as a busy modem does: the link's
    // writes then wait for room.
    void stall(int milliseconds);
    // True while a stall lasts, and a moment after, while the pipe drains.
    bool stalled() const;

    // Records the link wrote, oldest first, from index `from` on.
    std::vector<android::VPR_Comm> recordsSince(size_t from) const;
    size_t recordCount() const;

private:
    void readLoop();
    void take(const android::VPR_Comm& record);

    Timeline* const mTimeline;
    ModemPty mPty;
    mutable std::mutex mLock;
    std::vector<android::VPR_Comm> mRecords;
    std::atomic<bool> mStop{false};
    std::atomic<int64_t> mStallUntilNs{0};
    std::thread mReader;  // last: starts once everything above exists
};

#endif  // QUELLBORN_TOOLS_VCESIM_MODEMACTOR_H
