// What happened during a simulated call, in order, from every thread: the
// actors' steps, the platform calls the system made, records on the pipe,
// client events, log lines and expectation results.
//
// Platform calls carry no clock, so order is kept by position: every entry
// notes how many platform calls had been recorded when it happened, and a
// call's position is its index in the call record. Sorting by position puts
// each entry between the calls it happened between.
#ifndef QUELLBORN_TOOLS_VCESIM_TIMELINE_H
#define QUELLBORN_TOOLS_VCESIM_TIMELINE_H

#include <chrono>
#include <cstddef>
#include <mutex>
#include <string>
#include <vector>

struct TimelineEntry {
    enum class Kind { kHeading, kStep, kCall, kRecordOut, kEvent, kLog, kExpectOk, kExpectFailed };
    Kind kind = Kind::kStep;
    long ms = -1;           // since the start; -1 shows no time
    size_t position = 0;    // platform calls recorded before it (a call: its index)
    size_t sequence = 0;    // order of arrival, among entries of one position
    std::string actor;      // the timeline's first column
    std::string target;     // "link", "service", ... ; empty when it is no message
    std::string text;
    // Message sequence chart: from and to entity, empty when not drawn.
    std::string mscFrom;
    std::string mscTo;
};

class Timeline {
public:
    Timeline();

    // Stamps time, position and sequence (a call keeps the position given).
    void add(TimelineEntry entry);
    void addCall(size_t index, const std::string& actor, const std::string& text, const std::string& mscFrom,
                 const std::string& mscTo);

    // Entries not yet taken, in timeline order; later calls return only newer ones.
    std::vector<TimelineEntry> takeNew();
    // Every entry so far, in timeline order.
    std::vector<TimelineEntry> all() const;
    long elapsedMs() const;

private:
    static void sortEntries(std::vector<TimelineEntry>* entries);

    const std::chrono::steady_clock::time_point mStart;
    mutable std::mutex mLock;
    std::vector<TimelineEntry> mEntries;
    std::vector<TimelineEntry> mAll;
    size_t mSequence = 0;
};

#endif  // QUELLBORN_TOOLS_VCESIM_TIMELINE_H
