// Prints timeline entries as aligned lines that read at a glance:
//
//     12 ms  modem   -> link     START stream 1 sendrecv 10.0.0.1:6000 <-> ...
//            media   Mvd_Open("10.0.0.1", 6000, out=1) = 0
//     15 ms  link    -> modem    BIND stream 1 10.0.0.1:6000
//
// Log lines only when verbose; colour only when asked (a terminal).
#ifndef QUELLBORN_TOOLS_VCESIM_TIMELINEPRINTER_H
#define QUELLBORN_TOOLS_VCESIM_TIMELINEPRINTER_H

#include <ostream>
#include <string>
#include <vector>

#include "Timeline.h"

class TimelinePrinter {
public:
    TimelinePrinter(std::ostream& out, bool verbose, bool colour);

    void print(const std::vector<TimelineEntry>& entries);
    // One entry's line, without colour and without the newline.
    static std::string line(const TimelineEntry& entry);
    // A transaction and its reply on one line: "... SET_CAMERAID 1 = 0".
    static std::string line(const TimelineEntry& request, const TimelineEntry& reply);
    static bool isReplyTo(const TimelineEntry& request, const TimelineEntry& next);

private:
    std::string painted(const TimelineEntry& entry, const std::string& text) const;
    bool shown(const TimelineEntry& entry) const;

    std::ostream& mOut;
    const bool mVerbose;
    const bool mColour;
};

#endif  // QUELLBORN_TOOLS_VCESIM_TIMELINEPRINTER_H
