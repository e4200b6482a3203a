#include "Timeline.h"

#include <algorithm>
#include <tuple>

#include "HostFakes.h"

Timeline::Timeline() : mStart(std::chrono::steady_clock::now()) {}

long Timeline::elapsedMs() const {
    return static_cast<long>(
            std::chrono::duration_cast<std::chrono::milliseconds>(std::chrono::steady_clock::now() - mStart)
                    .count());
}

void Timeline::add(TimelineEntry entry) {
    if (entry.kind != TimelineEntry::Kind::kCall) {
        entry.position = hostfakes::callCount();
        if (entry.ms < 0 && entry.kind != TimelineEntry::Kind::kLog) entry.ms = elapsedMs();
    }
    std::lock_guard<std::mutex> lock(mLock);
    entry.sequence = mSequence++;
    mEntries.push_back(entry);
    mAll.push_back(entry);
}

void Timeline::addCall(size_t index, const std::string& actor, const std::string& text, const std::string& mscFrom,
                       const std::string& mscTo) {
    TimelineEntry entry;
    entry.kind = TimelineEntry::Kind::kCall;
    entry.position = index;
    entry.actor = actor;
    entry.text = text;
    entry.mscFrom = mscFrom;
    entry.mscTo = mscTo;
    add(entry);
}

void Timeline::sortEntries(std::vector<TimelineEntry>* entries) {
    // An entry noted while p calls existed comes before call p (the p+1-th).
    auto key = [](const TimelineEntry& e) {
        return std::make_tuple(e.position, e.kind == TimelineEntry::Kind::kCall ? 1 : 0, e.sequence);
    };
    std::stable_sort(entries->begin(), entries->end(),
                     [&](const TimelineEntry& a, const TimelineEntry& b) { return key(a) < key(b); });
}

std::vector<TimelineEntry> Timeline::takeNew() {
    std::vector<TimelineEntry> out;
    {
        std::lock_guard<std::mutex> lock(mLock);
        out.swap(mEntries);
    }
    sortEntries(&out);
    return out;
}

std::vector<TimelineEntry> Timeline::all() const {
    std::vector<TimelineEntry> out;
    {
        std::lock_guard<std::mutex> lock(mLock);
        out = mAll;
    }
    sortEntries(&out);
    return out;
}
