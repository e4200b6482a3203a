#include "CommandHistory.h"

#include <time.h>

#include <cstdio>

namespace android {

void CommandHistory::describeReply(const CmdBuffer* reply, ReplyText& out) {
    if (reply == nullptr) {
        snprintf(out, kReplyTextSize, "none");
        return;
    }
    const auto* bind = reinterpret_cast<const VprNetBind*>(reply->getCmd());
    if (reply->type != VPR_COMM_NET || bind->code != VPR_NET_CMD_BIND) {
        snprintf(out, kReplyTextSize, "record type %u", static_cast<unsigned>(reply->type));
        return;
    }
    char ip[kIpTextSize] = {};
    const bool ipv4 = bind->addr.type == kAddrTypeIpv4 || bind->addr.type == kAddrTypeIpv4Alt;
    ConvertIpToString(ip, ipv4 ? static_cast<const void*>(bind->addr.ipv4) : bind->addr.ipv6, ipv4);
    snprintf(out, kReplyTextSize, ipv4 ? "bind %s:%u" : "bind [%s]:%u", ip, static_cast<unsigned>(bind->addr.port));
}

int64_t CommandHistory::monotonicMs() {
    timespec now{};
    clock_gettime(CLOCK_MONOTONIC, &now);
    return static_cast<int64_t>(now.tv_sec) * 1000 + now.tv_nsec / 1000000;
}

void CommandHistory::record(const CmdBuffer& cmd, uint32_t streamId, const ReplyText& reply, bool refused) {
    Entry entry{};
    entry.monotonicMs = monotonicMs();
    entry.code = cmd.command().code;
    entry.streamId = streamId;
    snprintf(entry.reply, kReplyTextSize, "%s%s", reply, refused ? " (refused: link stopped)" : "");
    std::lock_guard<std::mutex> lock(mMutex);
    entry.number = ++mTotal;
    mRing[(entry.number - 1) % kCapacity] = entry;
}

std::vector<CommandHistory::Entry> CommandHistory::entries() const {
    std::lock_guard<std::mutex> lock(mMutex);
    const uint64_t kept = mTotal < kCapacity ? mTotal : kCapacity;
    std::vector<Entry> out;
    out.reserve(kept);
    for (uint64_t number = mTotal - kept + 1; number <= mTotal; ++number) {
        out.push_back(mRing[(number - 1) % kCapacity]);
    }
    return out;
}

uint64_t CommandHistory::total() const {
    std::lock_guard<std::mutex> lock(mMutex);
    return mTotal;
}

}  // namespace android
