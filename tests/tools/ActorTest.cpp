// The simulator's modem and log actors on their own: records both ways
// through a real pseudo-terminal, and the platform log taken and given back.
#include <android/log.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <chrono>
#include <cstdlib>
#include <thread>

#include "LogTap.h"
#include "ModemActor.h"
#include "RecordDecoder.h"

using namespace std::chrono_literals;

namespace {

bool readAll(int fd, void* out, size_t size) {
    char* p = static_cast<char*>(out);
    while (size > 0) {
        const ssize_t n = read(fd, p, size);
        if (n <= 0) return false;
        p += n;
        size -= static_cast<size_t>(n);
    }
    return true;
}

}  // namespace

TEST(ModemActorPipe, StepsGoInAndRecordsComeBackInPieces) {
    Timeline timeline;
    ModemActor modem(&timeline);
    EXPECT_STREQ(modem.devicePath(), getenv("QUELLBORN_MODEM_PIPE"));
    const int link = open(modem.devicePath(), O_RDWR | O_NOCTTY);
    ASSERT_GE(link, 0);

    StepSyntax::Step step;
    std::string error;
    ASSERT_TRUE(StepSyntax::parse("start stream=2 local=10.0.0.1:6000", &step, &error)) << error;
    modem.send(step);
    android::VPR_Comm written;
    ASSERT_TRUE(readAll(link, &written, sizeof(written)));
    EXPECT_EQ("START stream 2 sendrecv 10.0.0.1:6000 <-> no address (type 4) pt 96", RecordDecoder::summary(written));

    // The link's reply arrives in two pieces; the actor puts it together.
    ASSERT_TRUE(StepSyntax::parse("raw target=1 code=7", &step, &error)) << error;
    const android::VPR_Comm reply = step.record();
    const char* bytes = reinterpret_cast<const char*>(&reply);
    ASSERT_EQ(1000, write(link, bytes, 1000));
    std::this_thread::sleep_for(60ms);
    ASSERT_EQ(static_cast<ssize_t>(sizeof(reply) - 1000), write(link, bytes + 1000, sizeof(reply) - 1000));
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(5);
    while (modem.recordCount() == 0 && std::chrono::steady_clock::now() < deadline) std::this_thread::sleep_for(1ms);
    ASSERT_EQ(1u, modem.recordCount());
    EXPECT_EQ("BIND stream 0 0.0.0.0:0", RecordDecoder::summary(modem.recordsSince(0)[0]));
    EXPECT_TRUE(modem.recordsSince(1).empty());
    close(link);
    // Both went into the timeline; SimulatorTest checks how they are shown.
    EXPECT_EQ(2u, timeline.all().size());
}

