#include "ModemActor.h"

#include <poll.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstdlib>

#include "RecordDecoder.h"

using android::VPR_Comm;

ModemActor::ModemActor(Timeline* timeline) : mTimeline(timeline) {
    setenv("QUELLBORN_MODEM_PIPE", mPty.devicePath(), 1);
    mReader = std::thread([this] { readLoop(); });
}

ModemActor::~ModemActor() {
    mStop.store(true);
    mReader.join();
}

void ModemActor::send(const StepSyntax::Step& step) {
    const VPR_Comm record = step.record();
    TimelineEntry entry;
    entry.actor = "modem";
    entry.target = "link";
    entry.text = RecordDecoder::summary(record);
    entry.mscFrom = "modem";
    entry.mscTo = "link";
    mTimeline->add(entry);
    mPty.writeRecord(record);
}

namespace {

int64_t nowNs() {
    return std::chrono::duration_cast<std::chrono::nanoseconds>(std::chrono::steady_clock::now().time_since_epoch())
            .count();
}

}  // namespace

void ModemActor::stall(int milliseconds) {
    mStallUntilNs.store(nowNs() + int64_t{milliseconds} * 1000000);
}

bool ModemActor::stalled() const {
    return nowNs() < mStallUntilNs.load() + 200 * 1000000LL;
}

void ModemActor::readLoop() {
    // Bytes are gathered across polls: a record may arrive in pieces.
    VPR_Comm record;
    size_t got = 0;
    while (!mStop.load()) {
        if (nowNs() < mStallUntilNs.load()) {
            usleep(5 * 1000);
            continue;
        }
        struct pollfd pfd {mPty.masterFd(), POLLIN, 0};
        const int ready = poll(&pfd, 1, 20);
        if (ready <= 0 || (pfd.revents & POLLIN) == 0) {
            if (ready > 0) usleep(20 * 1000);  // hang-up or error: nothing to read, do not spin
            continue;
        }
        const ssize_t n = read(mPty.masterFd(), reinterpret_cast<char*>(&record) + got, sizeof(record) - got);
        if (n <= 0) continue;
        got += static_cast<size_t>(n);
        if (got == sizeof(record)) {
            take(record);
            got = 0;
        }
    }
}

void ModemActor::take(const VPR_Comm& record) {
    // Into the timeline first: whoever waits for the record and then reads
    // the timeline must find it there.
    TimelineEntry entry;
    entry.kind = TimelineEntry::Kind::kRecordOut;
    entry.actor = "link";
    entry.target = "modem";
    entry.text = RecordDecoder::summary(record);
    entry.mscFrom = "link";
    entry.mscTo = "modem";
    mTimeline->add(entry);
    std::lock_guard<std::mutex> lock(mLock);
    mRecords.push_back(record);
}

std::vector<VPR_Comm> ModemActor::recordsSince(size_t from) const {
    std::lock_guard<std::mutex> lock(mLock);
    if (from >= mRecords.size()) return {};
    return std::vector<VPR_Comm>(mRecords.begin() + static_cast<std::ptrdiff_t>(from), mRecords.end());
}

size_t ModemActor::recordCount() const {
    std::lock_guard<std::mutex> lock(mLock);
    return mRecords.size();
}
