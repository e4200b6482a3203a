// Writes a simulated call as a message sequence chart in mscgen's language,
// so `mscgen -T png -o call.png FILE` draws the ladder: IMS client,
// service/engine, media libraries, modem link and modem, with an arc for
// every transaction, record, library call and event.
#ifndef QUELLBORN_TOOLS_VCESIM_MSCWRITER_H
#define QUELLBORN_TOOLS_VCESIM_MSCWRITER_H

#include <ostream>
#include <string>
#include <vector>

#include "Timeline.h"

class MscWriter {
public:
    static void write(const std::vector<TimelineEntry>& entries, std::ostream& out);
    // A text safe inside an mscgen label string.
    static std::string escaped(const std::string& text);
};

#endif  // QUELLBORN_TOOLS_VCESIM_MSCWRITER_H
