#include "TimelinePrinter.h"

#include <cstdio>
#include <cstring>

namespace {

using Kind = TimelineEntry::Kind;

constexpr size_t kActorWidth = 7;
constexpr size_t kTargetWidth = 10;
constexpr const char* kReply = "<- reply ";

std::string padded(const std::string& text, size_t width) {
    return text.size() >= width ? text + " " : text + std::string(width - text.size() + 1, ' ');
}

const char* colourOf(const TimelineEntry& entry) {
    switch (entry.kind) {
        case Kind::kHeading: return "\033[1m";
        case Kind::kLog: return "\033[2m";
        case Kind::kExpectOk: return "\033[32m";
        case Kind::kExpectFailed: return "\033[1;31m";
        default: break;
    }
    if (entry.actor == "client") return "\033[36m";
    if (entry.actor == "modem" || entry.actor == "link") return "\033[33m";
    return "\033[35m";
}

}  // namespace

TimelinePrinter::TimelinePrinter(std::ostream& out, bool verbose, bool colour)
    : mOut(out), mVerbose(verbose), mColour(colour) {}

std::string TimelinePrinter::line(const TimelineEntry& entry) {
    if (entry.kind == Kind::kHeading) return "\n== " + entry.text;
    char time[32];
    if (entry.ms >= 0) {
        snprintf(time, sizeof(time), "%6ld ms", entry.ms);
    } else {
        snprintf(time, sizeof(time), "%9s", "");
    }
    std::string out = std::string(time) + "  " + padded(entry.actor, kActorWidth);
    if (!entry.target.empty()) out += padded("-> " + entry.target, kTargetWidth);
    return out + entry.text;
}

bool TimelinePrinter::isReplyTo(const TimelineEntry& request, const TimelineEntry& next) {
    return request.kind == Kind::kStep && request.target == "service" && next.actor == request.actor &&
           next.text.compare(0, 3, "<- ") == 0 && next.text.find("reply") != std::string::npos;
}

std::string TimelinePrinter::line(const TimelineEntry& request, const TimelineEntry& reply) {
    const bool plain = reply.text.compare(0, strlen(kReply), kReply) == 0;
    return line(request) + " = " + (plain ? reply.text.substr(strlen(kReply)) : reply.text.substr(3));
}

std::string TimelinePrinter::painted(const TimelineEntry& entry, const std::string& text) const {
    if (!mColour) return text;
    return colourOf(entry) + text + "\033[0m";
}

bool TimelinePrinter::shown(const TimelineEntry& entry) const { return mVerbose || entry.kind != Kind::kLog; }

void TimelinePrinter::print(const std::vector<TimelineEntry>& entries) {
    for (size_t i = 0; i < entries.size(); ++i) {
        const TimelineEntry& entry = entries[i];
        if (!shown(entry)) continue;
        size_t next = i + 1;
        while (next < entries.size() && !shown(entries[next])) ++next;
        if (next < entries.size() && isReplyTo(entry, entries[next])) {
            mOut << painted(entry, line(entry, entries[next])) << "\n";
            i = next;
        } else {
            mOut << painted(entry, line(entry)) << "\n";
        }
    }
    mOut.flush();
}
