// Reading scenarios: every actor's steps, headings, and the complaints that
// stop a scenario before it runs. The built-in scenarios are read and played
// by the vce-sim CTest entries; the modem steps' own syntax by StepSyntaxTest.
#include <gtest/gtest.h>


#include "Scenario.h"

using Actor = ScenarioStep::Actor;

namespace {

Scenario parsed(const std::string& text) {
    Scenario scenario;
    std::string error;
    EXPECT_TRUE(Scenario::parse(text, &scenario, &error)) << error;
    return scenario;
}

std::string errorOf(const std::string& text) {
    Scenario scenario;
    std::string error;
    EXPECT_FALSE(Scenario::parse(text, &scenario, &error)) << text;
    return error;
}

}  // namespace

TEST(ScenarioParse, EachActorsStepsKeepTheirArguments) {
    const Scenario s = parsed("## set-up\n"
                              "client orientation 90 0 1   # device, screen, auto-rotate\n"
                              "client surface local\n"
                              "client init loopback\n"
                              "client hide /data/a b.png\n"
                              "modem start stream=2 local=10.0.0.1:6000\n"
                              "media zmf 27 {\"Render\":\"Remote\"}\n"
                              "wait 20\n"
                              "expect event 11 480 640 0\n"
                              "expect call Mvd_Open(\"10.0.0.1\", 6000\n"
                              "expect bind stream=2 local=[::1]:6000\n"
                              "dump --link   # as dumpsys takes them\n"
                              "expect dump read: 1 records\n");
    std::vector<std::string> shown;  // "actor line verb ints [text]" per step
    for (const ScenarioStep& step : s.steps()) {
        shown.push_back(std::to_string(static_cast<int>(step.actor)) + " " + std::to_string(step.line) + " " + step.verb);
        for (int32_t v : step.ints) shown.back() += " " + std::to_string(v);
        shown.back() += " [" + step.text + "]";
    }
    EXPECT_EQ((std::vector<std::string>{"0 1  [set-up]", "1 2 orientation 90 0 1 []", "1 3 surface 1 [local]",
                                        "1 4 init 1 []", "1 5 hide [/data/a b.png]", "2 6 modem []",
                                        "3 7 zmf 27 [{\"Render\":\"Remote\"}]", "5 8 wait 20 []",
                                        "6 9 event 11 480 640 0 []", "6 10 call [Mvd_Open(\"10.0.0.1\", 6000]",
                                        "6 11 bind []", "7 12 dump [--link]", "6 13 dump [read: 1 records]"}),
              shown);
    EXPECT_EQ("client orientation 90 0 1", s.steps()[1].source);
    EXPECT_EQ(2u, s.steps()[5].modem.stream.streamId);
    EXPECT_TRUE(s.steps()[10].hasLocal);
    EXPECT_EQ(2u, s.steps()[10].modem.stream.localAddr.type);
}

TEST(ScenarioParse, ErrorsNameTheLineAndWhatWasExpected) {
    const std::pair<std::string, std::string> cases[] = {
            {"client callback\nclient camrea 1",
             "line 2: expected a client action (callback, callback-reentrant, clean-callback, init, surface, clean-surface, camera, size, "
             "orientation, qos, hide, show, release, die, send) but found 'camrea'"},
            {"client camera one", "line 1: expected camera ID but found 'one'"},
            {"client orientation 90 0", "line 1: expected orientation DEVICE SCREEN AUTOROTATE but found end of line"},
            {"client surface middle", "line 1: expected surface remote|local but found 'middle'"},
            {"client release now", "line 1: expected end of line after release but found 'now'"},
            {"\n\nmodem start", "line 3: expected stream=N (0..4294967295) but found end of line"},
            {"media rtp-lost", "line 1: expected a media event (rtp-first, rtp-break, rtp-received, codec-changed, "
                               "capture-size, event, remote-size, zmf) but found 'rtp-lost'"},
            {"expect event 11 480", "line 1: expected event N [VALUE1 VALUE2 VALUE3] but found 'only 1 values'"},
            {"expect bind local=1.2.3.4:5", "line 1: expected bind stream=N [local=IP:PORT] but found 'local=1.2.3.4:5'"},
            {"expect call", "line 1: expected call TEXT but found end of line"},
            {"wait 70000", "line 1: expected wait 0..60000 (milliseconds) but found '70000'"},
            {"camera 1", "line 1: expected client, modem, media, link, wait, dump, expect or a ## heading but found 'camera'"},
            {"expect dump", "line 1: expected dump TEXT but found end of line"},
    };
    for (const auto& c : cases) EXPECT_EQ(c.second, errorOf(c.first)) << c.first;
}
