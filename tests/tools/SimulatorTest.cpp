// A whole scenario played in-process against the real system: the verdicts
// the simulator gives and the timeline it keeps. The engine and its link are
// process singletons, so this suite plays one scenario (CTest runs each case
// in a process of its own).
#include <gtest/gtest.h>

#include <chrono>
#include <sstream>
#include <thread>

#include "CallbackTracker.h"
#include "HostFakes.h"
#include "Simulator.h"

TEST(SimulatorPlay, ReportsOnlyTheExpectationsThatDidNotHold) {
    Scenario scenario;
    std::string error;
    ASSERT_TRUE(Scenario::parse("client callback\n"
                                "client init\n"
                                "modem start stream=3 local=10.0.0.1:6000 remote=192.168.1.2:5000\n"
                                "expect bind stream=3 local=10.0.0.1:6000\n"
                                "expect bind stream=3 local=10.0.0.2:6000\n"
                                "expect call Mvd_SetRmtAddr(1, \"192.168.1.2\", 5000) = 0\n"
                                "expect no-call Mvd_Open\n"
                                "media rtp-break\n"
                                "expect event 14\n"
                                "expect event 15\n"
                                "expect log mmeEvtUpdate evt: 22\n"
                                "client camera 1\n"
                                "expect reply 0\n"
                                "expect reply 3\n",
                                &scenario, &error))
            << error;
    std::ostringstream out;
    std::vector<std::string> failures;
    std::vector<TimelineEntry> entries;
    {
        Simulator simulator(Simulator::Options{}, out);
        failures = simulator.play(scenario);
        entries = simulator.timeline().all();
    }
    ASSERT_EQ(4u, failures.size()) << out.str();
    EXPECT_EQ(0u, failures[0].find("line 5: expect bind stream=3 local=10.0.0.2:6000: no such record since line 3; "
                                   "records from the link:\n      BIND stream 3 10.0.0.1:6000"))
            << failures[0];
    EXPECT_EQ(0u, failures[1].find("line 7: expect no-call Mvd_Open: called:\n      Mvd_Open(\"10.0.0.1\", 6000, out=1) = 0"))
            << failures[1];
    EXPECT_EQ("line 10: expect event 15: not received since line 8; events:\n      event 14", failures[2]);
    EXPECT_EQ("line 14: expect reply 3: the reply was 0", failures[3]);

    const std::string text = out.str();
    EXPECT_NE(std::string::npos, text.find("modem   -> link    START stream 3 sendrecv 10.0.0.1:6000 <-> 192.168.1.2:5000 pt 96\n"
                                           "           media   Mvd_Open(\"10.0.0.1\", 6000, out=1) = 0\n"));
    EXPECT_NE(std::string::npos, text.find("link    -> modem   BIND stream 3 10.0.0.1:6000\n"));
    EXPECT_NE(std::string::npos, text.find("expect  FAILED  reply 3\n"));
    EXPECT_EQ(std::string::npos, text.find("  log     "));  // log lines only when verbose
    size_t logs = 0;
    for (const TimelineEntry& e : entries) logs += e.kind == TimelineEntry::Kind::kLog;
    EXPECT_GT(logs, 0u);
}

// A handling thread kept off the CPU past the settle's quiet spell (here a
// media engine call that takes 300 ms) answers late, not never: the bind
// invariant must wait for it rather than report a lost reply.
TEST(SimulatorInvariants, ALateBindRequestIsNotALostOne) {
    Scenario scenario;
    std::string error;
    ASSERT_TRUE(Scenario::parse("modem start stream=3 local=10.0.0.1:6000 remote=192.168.1.2:5000\n", &scenario,
                                &error))
            << error;
    std::ostringstream out;
    Simulator::Options options;
    options.invariants = true;
    Simulator simulator(options, out);
    hostfakes::holdCalls("Mvd_Open");
    std::thread answer([] {
        std::this_thread::sleep_for(std::chrono::milliseconds(300));
        hostfakes::releaseCalls();
    });
    EXPECT_EQ("", simulator.step(scenario.steps()[0])) << out.str();
    answer.join();
}

// The callback invariant's account of which callbacks the engine may still
// notify, through the interleavings several client threads make.
TEST(SimulatorInvariants, ACallbackIsRetiredOnlyByAChangeIssuedAfterItsRegistrationReturned) {
    CallbackTracker callbacks;
    const int first = callbacks.registering();
    const CallbackTracker::Change none = callbacks.changeIssued();
    callbacks.registered(first);
    callbacks.changeReturned(none);
    EXPECT_FALSE(callbacks.retired(first));

    // A registration sent while a notification of the first is in progress
    // waits for it; the handler clears the callback meanwhile, and the
    // engine takes that clear first.
    const int second = callbacks.registering();
    const CallbackTracker::Change replaced = callbacks.changeIssued();
    const CallbackTracker::Change cleared = callbacks.changeIssued();
    callbacks.changeReturned(cleared);
    EXPECT_TRUE(callbacks.retired(first));
    callbacks.registered(second);
    callbacks.changeReturned(replaced);
    EXPECT_FALSE(callbacks.retired(second));
    EXPECT_TRUE(callbacks.anyRegistered());

    // Until a release returns, the callback it drops may still be notified.
    const CallbackTracker::Change released = callbacks.changeIssued();
    EXPECT_FALSE(callbacks.retired(second));
    callbacks.changeReturned(released);
    EXPECT_TRUE(callbacks.retired(second));
    EXPECT_FALSE(callbacks.anyRegistered());

    // A dead binder is retired at once, a registration still in flight is not.
    const int third = callbacks.registering(), fourth = callbacks.registering();
    callbacks.registered(third);
    callbacks.died(third);
    EXPECT_TRUE(callbacks.retired(third));
    EXPECT_FALSE(callbacks.retired(fourth));
}
