// The scenarios vce-sim plays without --scenario: the texts of
// tools/vce-sim/scenarios/call.scn and loopback.scn, built into the program.
#ifndef QUELLBORN_TOOLS_VCESIM_BUILTINSCENARIOS_H
#define QUELLBORN_TOOLS_VCESIM_BUILTINSCENARIOS_H

class BuiltInScenarios {
public:
    static const char* call();
    static const char* loopback();
};

#endif  // QUELLBORN_TOOLS_VCESIM_BUILTINSCENARIOS_H
