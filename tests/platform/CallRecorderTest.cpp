// The host stand-ins' record can be switched off for long runs without
// changing what the stand-ins answer or the state they keep.
#include <gtest/gtest.h>

#include "HostFakes.h"
#include "Mvd.h"

TEST(CallRecorder, RecordingOffKeepsNoCallsButAnswersAndStateStayTheSame) {
    hostfakes::reset();
    hostfakes::setRecording(false);
    hostfakes::setResult("Mvd_ProcStart", -7);
    unsigned int id = 0;
    EXPECT_EQ(0, Mvd_Open("10.0.0.1", 6000, &id));
    EXPECT_EQ(1u, id);
    EXPECT_EQ(-7, Mvd_ProcStart(id));
    EXPECT_EQ(0u, hostfakes::callCount());
    EXPECT_EQ(std::vector<unsigned int>{1}, hostfakes::openMvdStreams());

    hostfakes::reset();  // keeps the setting, forgets the override
    EXPECT_EQ(0, Mvd_ProcStart(id));
    EXPECT_EQ(0u, hostfakes::callCount());

    hostfakes::setRecording(true);
    EXPECT_EQ(0, Mvd_ProcStart(id));
    EXPECT_EQ(std::vector<std::string>{"Mvd_ProcStart(1) = 0"}, hostfakes::callTexts());
}
