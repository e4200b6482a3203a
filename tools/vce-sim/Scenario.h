// A scenario for vce-sim: one step per line, played in order by three
// actors (client, modem, media) with waits, headings and expectations in
// between. The format is documented in docs/scenario-format.md. A scenario is
// parsed whole before anything runs, so a typo stops it before it starts.
#ifndef QUELLBORN_TOOLS_VCESIM_SCENARIO_H
#define QUELLBORN_TOOLS_VCESIM_SCENARIO_H

#include <cstdint>
#include <string>
#include <vector>

#include "StepSyntax.h"

struct ScenarioStep {
    enum class Actor { kHeading, kClient, kModem, kMedia, kLink, kWait, kExpect, kDump };
    Actor actor = Actor::kHeading;
    int line = 0;
    std::string source;         // the line as written, without comment
    std::string verb;           // "camera", "rtp-break", "call", ...
    std::vector<int32_t> ints;  // numeric arguments in order
    std::string text;           // free text (path, JSON, call text, heading, dump arguments)
    StepSyntax::Step modem;     // modem steps and `expect bind`
    bool hasLocal = false;      // `expect bind` names a local address
};

class Scenario {
public:
    // Parses a whole scenario; on failure `error` reads
    // "line N: expected ... but found ...".
    static bool parse(const std::string& text, Scenario* out, std::string* error);

    const std::vector<ScenarioStep>& steps() const { return mSteps; }

private:
    std::vector<ScenarioStep> mSteps;
};

#endif  // QUELLBORN_TOOLS_VCESIM_SCENARIO_H
