// The chaos run's own machinery: generated steps are valid scenario lines
// and repeat with their seed, and shrinking keeps just what a fault needs.
#include <gtest/gtest.h>

#include <algorithm>

#include "Chaos.h"
#include "ChaosGenerator.h"
#include "Scenario.h"

TEST(ChaosGenerator, EveryStepIsAScenarioLineAndASeedRepeatsItsSteps) {
    ChaosGenerator a(42), b(42), c(43);
    std::vector<std::string> first, other;
    for (int i = 0; i < 2000; ++i) {
        const std::string line = a.next();
        Scenario scenario;
        std::string error;
        ASSERT_TRUE(Scenario::parse(line, &scenario, &error)) << line << ": " << error;
        ASSERT_EQ(1u, scenario.steps().size()) << line;
        first.push_back(line);
        EXPECT_EQ(line, b.next());
        other.push_back(c.next());
    }
    EXPECT_NE(first, other);
    for (const char* actor : {"client ", "modem ", "media ", "link ", "dump"}) {
        EXPECT_TRUE(std::any_of(first.begin(), first.end(),
                                [actor](const std::string& line) { return line.rfind(actor, 0) == 0; }))
                << actor;
    }
}

TEST(ChaosShrink, KeepsOnlyTheStepsTheViolationNeedsInTheirOrder) {
    std::vector<std::string> lines;
    for (int i = 0; i < 50; ++i) lines.push_back("step " + std::to_string(i));
    int replays = 0;
    struct Context {
        int* replays;
    } context{&replays};
    // The fault needs step 7 and, later, step 31.
    auto reproduces = [](const std::vector<std::string>& candidate, const std::string& invariant, void* ctx) {
        ++*static_cast<Context*>(ctx)->replays;
        const auto seven = std::find(candidate.begin(), candidate.end(), "step 7");
        return invariant == "bind" && seven != candidate.end() &&
               std::find(seven, candidate.end(), "step 31") != candidate.end();
    };
    EXPECT_EQ((std::vector<std::string>{"step 7", "step 31"}), shrinkSteps(lines, "bind", reproduces, &context, 60));
    EXPECT_LT(replays, 100);
    // Out of time, it returns what it has, never less than reproduces.
    EXPECT_EQ(lines, shrinkSteps(lines, "bind", reproduces, &context, 0));
}
