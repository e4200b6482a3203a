// One record body in memory, travelling between the link's threads.
#ifndef QUELLBORN_VTSP_CMDBUFFER_H
#define QUELLBORN_VTSP_CMDBUFFER_H

#include <atomic>
#include <cstdint>
#include <memory>

#include "VprComm.h"

namespace android {

class CmdBuffer {
public:
    CmdBuffer();
    // Copies the body length of `type` from `bytes`; an unknown type copies nothing.
    CmdBuffer(VPR_CommType type, const unsigned char* bytes);
    // The command body of a received record, as the link queues it.
    static std::shared_ptr<CmdBuffer> fromRecord(const VPR_Comm& record);
    CmdBuffer(const CmdBuffer& other);
    CmdBuffer& operator=(const CmdBuffer& other);
    ~CmdBuffer();

    unsigned char* getCmd() { return cmd; }
    const unsigned char* getCmd() const { return cmd; }
    const VtspCommand& command() const { return *reinterpret_cast<const VtspCommand*>(cmd); }
    VtspCommand& command() { return *reinterpret_cast<VtspCommand*>(cmd); }

    // Converts the body's ports and IPv6 groups between wire and host order.
    void translate(bool toHost);
    // Fills a zeroed outgoing record from the body.
    void compose(VPR_Comm* out) const;
    // Logs a dump of a stream command.
    void print() const;

    VPR_CommType type;
    uint32_t length;
    alignas(4) unsigned char cmd[kCmdBufferCapacity];

    // Construction and destruction counts, for the destructor's log line.
    // Buffers are made and destroyed on several threads, hence atomics.
    static std::atomic<int32_t> con;
    static std::atomic<int32_t> des;
};

// Writes the text form of a record address: dotted IPv4 from the four octets,
// or eight hexadecimal IPv6 groups (host order) joined by ':'. `out` needs
// kIpTextSize bytes.
constexpr size_t kIpTextSize = 41;
void ConvertIpToString(char* out, const void* addr, bool ipv4);

}  // namespace android

#endif  // QUELLBORN_VTSP_CMDBUFFER_H
