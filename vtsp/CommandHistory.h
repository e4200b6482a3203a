// The last commands the link handled, for the service's dump: when (the
// monotonic clock), which code, which stream and what went back to the modem.
// A ring of fixed entries under a lock of its own, so recording never
// allocates and a reader never waits for the media engine.
#ifndef QUELLBORN_VTSP_COMMANDHISTORY_H
#define QUELLBORN_VTSP_COMMANDHISTORY_H

#include <array>
#include <cstddef>
#include <cstdint>
#include <mutex>
#include <vector>

#include "CmdBuffer.h"

namespace android {

class CommandHistory {
public:
    static constexpr size_t kCapacity = 32;
    static constexpr size_t kReplyTextSize = 64;

    struct Entry {
        uint64_t number;      // 1 for the first command the link handled
        int64_t monotonicMs;  // CLOCK_MONOTONIC when it was handled
        int32_t code;
        uint32_t streamId;
        char reply[kReplyTextSize];  // "none", "bind 10.0.0.1:6000", ...
    };

    using ReplyText = char[kReplyTextSize];
    // The dispatcher's answer (null for none) as the history shows it; read
    // in host order, before the link hands it to the transmit thread.
    static void describeReply(const CmdBuffer* reply, ReplyText& out);
    // Records a handled command; `refused` when its reply was not taken for
    // sending (the link was stopped).
    void record(const CmdBuffer& cmd, uint32_t streamId, const ReplyText& reply, bool refused);
    // Oldest first, at most kCapacity.
    std::vector<Entry> entries() const;
    uint64_t total() const;

    static int64_t monotonicMs();

private:
    mutable std::mutex mMutex;
    std::array<Entry, kCapacity> mRing{};
    uint64_t mTotal = 0;
};

}  // namespace android

#endif  // QUELLBORN_VTSP_COMMANDHISTORY_H
