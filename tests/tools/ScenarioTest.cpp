// Reading scenarios: every actor's steps, headings, and the complaints that
// stop a scenario before it runs. The built-in scenarios are read and played
// by the vce-sim CTest entries; the modem steps' own syntax by StepSyntaxTest.
#include <gtest/gtest.h>

#include <random>

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
    const std::vector<ScenarioStep>& steps = s.steps();
    ASSERT_EQ(13u, steps.size());
    EXPECT_EQ(Actor::kHeading, steps[0].actor);
    EXPECT_EQ("set-up", steps[0].text);
    EXPECT_EQ(Actor::kClient, steps[1].actor);
    EXPECT_EQ((std::vector<int32_t>{90, 0, 1}), steps[1].ints);
    EXPECT_EQ("client orientation 90 0 1", steps[1].source);
    EXPECT_EQ(2, steps[1].line);
    EXPECT_EQ((std::vector<int32_t>{1}), steps[2].ints);
    EXPECT_EQ((std::vector<int32_t>{1}), steps[3].ints);
    EXPECT_EQ("/data/a b.png", steps[4].text);
    EXPECT_EQ(Actor::kModem, steps[5].actor);
    EXPECT_EQ(2u, steps[5].modem.stream.streamId);
    EXPECT_EQ(Actor::kMedia, steps[6].actor);
    EXPECT_EQ((std::vector<int32_t>{27}), steps[6].ints);
    EXPECT_EQ("{\"Render\":\"Remote\"}", steps[6].text);
    EXPECT_EQ(Actor::kWait, steps[7].actor);
    EXPECT_EQ((std::vector<int32_t>{11, 480, 640, 0}), steps[8].ints);
    EXPECT_EQ("Mvd_Open(\"10.0.0.1\", 6000", steps[9].text);
    EXPECT_TRUE(steps[10].hasLocal);
    EXPECT_EQ(2u, steps[10].modem.stream.localAddr.type);
    EXPECT_EQ(Actor::kDump, steps[11].actor);
    EXPECT_EQ("--link", steps[11].text);
    EXPECT_EQ("read: 1 records", steps[12].text);
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

TEST(ScenarioParse, RandomTextIsRefusedOrReadNeverACrash) {
    std::mt19937 random(7);
    const char* words[] = {"client", "modem", "media", "expect", "wait", "camera", "start", "stream=1", "event", "call",
                           "bind", "zmf", "1", "-5", "0x", "#", "##", "\n", " ", "local=", "[::1]:1", "surface"};
    for (int i = 0; i < 5000; ++i) {
        std::string text;
        const size_t count = random() % 40;
        for (size_t j = 0; j < count; ++j) {
            text += random() % 5 == 0 ? std::string(1, static_cast<char>(random() % 256))
                                      : std::string(words[random() % (sizeof(words) / sizeof(words[0]))]) + " ";
        }
        Scenario scenario;
        std::string error;
        if (!Scenario::parse(text, &scenario, &error)) {
            EXPECT_EQ(0u, error.find("line ")) << error;
            EXPECT_NE(std::string::npos, error.find(": expected ")) << error;
        }
    }
}
